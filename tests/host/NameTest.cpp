#include "host/Exception.hpp"
#include "host/fileio/DataSourceFactory.hpp"
#include "host/fileio/File.hpp"
#include "host/fileio/QueryComponents.hpp"
#include "host/fileio/URI.hpp"
#include "tests/support/TempDir.hpp"

#include <filesystem>
#include <string>
#include <vector>

#include <gtest/gtest.h>

using orv::core::fileio::DataSource;
using orv::core::fileio::DataSourceFactory;
using orv::core::fileio::File;
using orv::core::fileio::QueryComponents;
using orv::core::fileio::URI;

namespace {

std::string CurrentDirectory() {
    return std::filesystem::current_path().string();
}

} // namespace

TEST(DataSourceFactory, tells_uris_from_files) {
    struct Case {
        const char *name;
        bool isUri;
    } cases[] = {
        {"product.xml", false},
        {"/data/rs2/product.xml", false},
        {"dir/product.xml:Calibration Type:Sigma Nought", false},
        {"C:/data/product.xml", false},
        {"1file:///data/product.xml", false}, // a scheme starts with a letter
        {"my_scheme://host/x", false},        // '_' is no scheme character
        {"product.xml?c=sigma", true},
        {"file:///data/product.xml", true},
        {"svn+ssh://host/x", true},
    };
    for (const Case &c : cases) {
        std::unique_ptr<DataSource> source =
            DataSourceFactory::GetInstance()->Create(c.name);
        EXPECT_EQ(dynamic_cast<URI *>(source.get()) != nullptr, c.isUri)
            << c.name;
        EXPECT_EQ(dynamic_cast<File *>(source.get()) != nullptr, !c.isUri)
            << c.name;
    }
}

TEST(DataSourceFactory, refuses_names_that_look_like_uris_but_do_not_parse) {
    for (const char *name :
         {"product.xml?c=%zz", "http://[::1/x", "http://host:port/x"}) {
        try {
            DataSourceFactory::GetInstance()->Create(name);
            ADD_FAILURE() << name;
        } catch (const orv::Exception &error) {
            EXPECT_EQ(error.what(),
                      "Invalid URI \"" + std::string(name) + "\"");
        }
    }
}

TEST(File, extended_information_starts_after_the_last_slash) {
    struct Case {
        const char *name;
        const char *fileName;
        const char *extendedInfo;
        const char *path;
    } cases[] = {
        {"dir/product.xml:Calibration Type:Sigma Nought", "dir/product.xml",
         ":Calibration Type:Sigma Nought", "dir/"},
        {"/a:b/product.xml", "/a:b/product.xml", "", "/a:b/"},
        {"/data/product.xml:", "/data/product.xml", ":", "/data/"},
        {"product.xml", "product.xml", "", ""},
        {"/product.xml", "/product.xml", "", "/"},
    };
    for (const Case &c : cases) {
        File file(c.name);
        EXPECT_EQ(file.GetFileName(), c.fileName);
        EXPECT_EQ(file.GetExtendedInfo(), c.extendedInfo);
        EXPECT_EQ(file.GetPath(), c.path);
        EXPECT_EQ(file.ToString(), c.name);
    }
}

TEST(File, normalized_name_is_absolute_and_folded_without_links) {
    std::string cwd = CurrentDirectory();
    std::string parent = std::filesystem::path(cwd).parent_path().string();
    struct Case {
        std::string name;
        std::string expected;
    } cases[] = {
        {"/data/./a/../product.xml:Calibration Type:Beta", "/data/product.xml"},
        {"/data//rs2/", "/data/rs2"},
        {"product.xml", cwd + "/product.xml"},
        {"../up/product.xml", parent + "/up/product.xml"},
    };
    for (const Case &c : cases)
        EXPECT_EQ(File(c.name).GetNormalizedName(), c.expected) << c.name;

    rs2test::TempDir dir;
    std::filesystem::create_directory(dir.File("real"));
    std::filesystem::create_directory_symlink(dir.File("real"),
                                              dir.File("link"));
    EXPECT_EQ(File(dir.File("link/product.xml")).GetNormalizedName(),
              dir.File("link/product.xml"));
}

TEST(File, set_basename_and_extension_keep_the_other_parts) {
    File product("dir/product.xml");
    std::unique_ptr<File> side =
        product.SetBasename("ProductDescription")->SetExtension("self");
    EXPECT_EQ(side->ToString(), "dir/ProductDescription.self");
    EXPECT_EQ(product.ToString(), "dir/product.xml");
    EXPECT_EQ(File("dir/a.tar.gz:x").SetBasename("b")->ToString(),
              "dir/b.gz:x");
    EXPECT_EQ(File("/a.b/product").SetExtension("self")->ToString(),
              "/a.b/product.self");
    EXPECT_EQ(File("dir/.hidden").SetExtension("x")->ToString(),
              "dir/.hidden.x");
    EXPECT_EQ(File("dir/a.xml").SetExtension("")->ToString(), "dir/a");
    EXPECT_EQ(
        File("a.xml").SetExtendedInfo("Calibration Type:Beta")->ToString(),
        "a.xml:Calibration Type:Beta");
    EXPECT_EQ(File::Create(""), nullptr);
}

TEST(URI, query_values_are_decoded) {
    struct Case {
        const char *text;
        const char *key;
        const char *expected;
    } cases[] = {
        {"product.xml?c=Sigma%20Nought", "c", "Sigma Nought"},
        {"product.xml?c=Sigma+Nought", "c", "Sigma Nought"},
        {"product.xml?c=Sigma Nought", "c", "Sigma Nought"},
        {"product.xml?a=1&c=beta&c=gamma", "c", "beta"},
        {"product.xml?c=caf%C3%A9", "c", "caf\xC3\xA9"},
        {"product.xml?c=a%26b%3Dc", "c", "a&b=c"},
        {"product.xml?c", "c", ""},
        {"product.xml?x=1", "c", ""},
    };
    for (const Case &c : cases)
        EXPECT_EQ(URI(c.text).GetFirstValue(c.key), c.expected) << c.text;
    EXPECT_TRUE(URI("product.xml?c").GetQueryComponents().HasKey("c"));
    EXPECT_FALSE(URI("product.xml?cc=1").GetQueryComponents().HasKey("c"));
}

TEST(URI, text_form_is_canonical_and_stable) {
    struct Case {
        const char *text;
        const char *expected;
    } cases[] = {
        {"product.xml?c=Sigma+Nought", "product.xml?c=Sigma%20Nought"},
        {"FILE:///tmp/a%20b/product.xml?c=beta#top",
         "file:///tmp/a%20b/product.xml?c=beta#top"},
        {"http://user@host:8080/p?q=1", "http://user@host:8080/p?q=1"},
        {"/tmp/a b/caf\xC3\xA9.xml", "/tmp/a%20b/caf%C3%A9.xml"},
        {"product.xml?", "product.xml"},
        {"//server/share/x", "//server/share/x"},
    };
    for (const Case &c : cases) {
        std::string text = URI(c.text).ToString();
        EXPECT_EQ(text, c.expected) << c.text;
        EXPECT_EQ(URI(text).ToString(), text);
    }
}

TEST(QueryComponents, set_pair_replaces_the_first_and_drops_later_ones) {
    QueryComponents query;
    query.AddPair("c", "Sigma Nought");
    query.AddPair("x", "1");
    query.AddPair("c", "beta");
    query.SetPair("c", "Sigma");
    query.SetPair("d", "2");
    EXPECT_EQ(query.Pairs(), (std::vector<QueryComponents::Pair>{
                                 {"c", "Sigma"}, {"x", "1"}, {"d", "2"}}));

    URI base("file:///tmp/p.xml?c=Sigma%20Nought&x=a%20b");
    std::unique_ptr<URI> changed = base.SetQueryComponents(query);
    EXPECT_EQ(changed->ToString(), "file:///tmp/p.xml?c=Sigma&x=1&d=2");
    EXPECT_EQ(base.GetFirstValue("c"), "Sigma Nought");
}

TEST(File, local_file_uris_convert_to_decoded_names) {
    struct Case {
        const char *text;
        const char *fileName;
        const char *extendedInfo;
    } cases[] = {
        {"file:///tmp/a%20b/product.xml?c=beta", "/tmp/a b/product.xml", ""},
        {"file://LocalHost/data/product.xml", "/data/product.xml", ""},
        {"file:///data/a+b/p.xml", "/data/a+b/p.xml", ""},
        {"file:///data/caf%C3%A9/p.xml", "/data/caf\xC3\xA9/p.xml", ""},
        {"file:///data/p.xml:Calibration%20Type:Beta", "/data/p.xml",
         ":Calibration Type:Beta"},
        {"dir/product.xml?c=sigma", "dir/product.xml", ""},
    };
    for (const Case &c : cases) {
        File file{URI(c.text)};
        EXPECT_EQ(file.GetFileName(), c.fileName) << c.text;
        EXPECT_EQ(file.GetExtendedInfo(), c.extendedInfo) << c.text;
    }
}

TEST(File, other_schemes_and_hosts_do_not_convert) {
    for (const char *text :
         {"http://example.org/product.xml", "ftp://h/product.xml",
          "file://server/share/product.xml", "//server/share/p.xml?c=1"}) {
        EXPECT_THROW(File{URI(text)}, orv::Exception) << text;
    }
}

TEST(File, file_uri_round_trip_keeps_the_name) {
    struct Case {
        const char *name;
        const char *uri;
    } cases[] = {
        {"/tmp/a b/product.xml", "file:///tmp/a%20b/product.xml"},
        {"/data/caf\xC3\xA9/p.xml", "file:///data/caf%C3%A9/p.xml"},
        {"/data/100%/a+b#c?d/p.xml", "file:///data/100%25/a%2Bb%23c%3Fd/p.xml"},
    };
    for (const Case &c : cases) {
        std::unique_ptr<URI> uri = File(c.name).ToURI();
        EXPECT_EQ(uri->ToString(), c.uri);
        EXPECT_EQ(File(*uri).GetFileName(), c.name);
    }
}

TEST(File, calibration_choice_moves_from_extended_info_to_query_and_back) {
    File named("product.xml:Calibration Type:Beta Nought");
    QueryComponents query;
    query.AddPair("c", "Beta");
    std::unique_ptr<URI> bare = named.SetExtendedInfo("")->ToURI();
    std::string canonical = URI(*bare, query).ToString();
    EXPECT_EQ(canonical,
              "file://" + CurrentDirectory() + "/product.xml?c=Beta");

    std::unique_ptr<DataSource> source =
        DataSourceFactory::GetInstance()->Create(canonical);
    auto *uri = dynamic_cast<URI *>(source.get());
    ASSERT_NE(uri, nullptr);
    EXPECT_EQ(uri->GetFirstValue("c"), "Beta");
    EXPECT_EQ(File(*uri).GetNormalizedName(),
              CurrentDirectory() + "/product.xml");
}
