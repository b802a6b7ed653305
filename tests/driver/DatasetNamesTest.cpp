#include "driver/DatasetNames.hpp"
#include "driver/DatasetLifecycle.hpp"
#include "driver/OpenDatasets.hpp"
#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/RasterHandle.hpp"
#include "host/RasterServices.hpp"
#include "host/XmlUtil.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

namespace {

std::string Normalized(const std::string &name) {
    std::unique_ptr<char, decltype(&std::free)> text(
        NormalizeDatasetName(name.c_str()), &std::free);
    return text.get();
}

std::string AbsoluteUri(const std::string &relative) {
    return "file://" + (std::filesystem::current_path() / relative)
                           .lexically_normal()
                           .string();
}

// Closes a dataset handle however a test ends.
struct DatasetCloser {
    void operator()(FILE *handle) const { CloseDataset(handle); }
};
using DatasetKeeper = std::unique_ptr<FILE, DatasetCloser>;

class GeneratedProduct : public ::testing::Test {
  protected:
    rs2gen::GeneratedProduct Make(const std::string &type) {
        options.productType = type;
        options.width = 16;
        options.height = 12;
        return rs2gen::GenerateProduct(folder.Path(), options);
    }
    rs2test::TempDir folder;
    rs2gen::ProductOptions options;
};

} // namespace

TEST(CalibrationNames, shorten_nought_names_and_lower_case_the_rest) {
    const std::pair<const char *, const char *> cases[] = {
        {"Sigma Nought", "Sigma"},
        {"beta nought", "Beta"},
        {"SigmaNought", "Sigma"},
        {"Gamma", "gamma"},
        {"None", "none"},
        {"nought", ""},
        {"", ""},
        {"GAMMA NOUGHT", "Gamma"},
        {"Beta Nought Nought", "Beta nought"},
    };
    for (const auto &[input, expected] : cases)
        EXPECT_EQ(NormalizeCalibrationName(input), expected) << input;
}

TEST(DatasetNames, canonical_forms) {
    const std::pair<std::string, std::string> cases[] = {
        {"dir/product.xml", "dir/product.xml"},
        {"dir/product.xml?c=Sigma%20Nought", "dir/product.xml?c=Sigma"},
        {"dir/product.xml?c=Sigma+Nought", "dir/product.xml?c=Sigma"},
        {"dir/product.xml?c=Gamma", "dir/product.xml?c=gamma"},
        {"dir/product.xml?c=none", "dir/product.xml?c=none"},
        {"dir/product.xml?x=1", "dir/product.xml?x=1"},
        {"file:///data/p/product.xml?c=beta%20nought",
         "file:///data/p/product.xml?c=Beta"},
        {"dir/product.xml:CALIBRATION TYPE:Beta Nought",
         AbsoluteUri("dir/product.xml") + "?c=Beta"},
        {"dir/product.xml:Calibration Type:None",
         AbsoluteUri("dir/product.xml") + "?c=none"},
        {"dir/product.xml:Other:Thing", "dir/product.xml:Other:Thing"},
    };
    for (const auto &[input, expected] : cases)
        EXPECT_EQ(Normalized(input), expected) << input;
}

TEST(DatasetNames, parse_file_name_accepts_files_and_local_uris_only) {
    EXPECT_EQ(ParseFileName("a/b/product.xml?c=sigma").GetPath(), "a/b/");
    EXPECT_EQ(ParseFileName("file:///x/y/product.xml").GetNormalizedName(),
              "/x/y/product.xml");
    EXPECT_EQ(
        ParseFileName("dir/product.xml:Calibration Type:Gamma").GetFileName(),
        "dir/product.xml");
    try {
        ParseFileName("http://example.invalid/product.xml");
        FAIL() << "an http name became a file";
    } catch (const orv::Exception &error) {
        EXPECT_STREQ(error.what(), "Could not parse filename "
                                   "\"http://example.invalid/product.xml\"");
    }
}

TEST(DatasetNames, unknown_keys_are_warned_about_by_name) {
    const std::pair<std::string, std::vector<std::string>> cases[] = {
        {"dir/product.xml?c=sigma", {}},
        {"dir/product.xml?calibration=sigma", {"calibration"}},
        {"dir/product.xml?foo=1&c=beta&C=gamma", {"foo", "C"}},
        {"dir/product.xml:Calibration Type:Gamma", {}},
    };
    for (const auto &[name, keys] : cases) {
        host::ClearWarnings();
        Normalized(name);
        std::vector<std::string> expected;
        for (const std::string &key : keys)
            expected.push_back("The dataset name " + name +
                               " holds the unknown key \"" + key +
                               "\", which is ignored; the only key known is "
                               "\"c\" (the calibration: sigma, beta, gamma "
                               "or none)");
        EXPECT_EQ(host::Warnings(), expected) << name;
    }
}

TEST(DatasetNames, a_percent_that_begins_no_escape_is_refused_clearly) {
    for (const std::string name :
         {"dir/product.xml?c=%", "dir/product.xml?c=%4",
          "dir/product.xml?c=%zz", "file:///dir/product%/product.xml"}) {
        try {
            Normalized(name);
            ADD_FAILURE() << name << " was accepted";
        } catch (const orv::Exception &error) {
            EXPECT_EQ(std::string(error.what()),
                      "Invalid dataset name \"" + name +
                          "\": a \"%\" must begin an escape of two "
                          "hexadecimal digits (\"%25\" for a percent sign "
                          "itself)");
        }
    }
    // In a plain file name a '%' is only a letter.
    EXPECT_EQ(Normalized("dir%/product.xml"), "dir%/product.xml");
}

TEST_F(GeneratedProduct, open_declares_type_codes_by_calibration_and_family) {
    struct Case {
        const char *type;
        const char *suffix;
        int32_t code;
    };
    const Case cases[] = {
        {"SLC", "", 7},
        {"SLC", "?c=sigma", 9},
        {"SLC", "?c=none", 7},
        {"SGF", "", 3},
        {"SGF", "?c=Beta", 4},
        {"SSG", "?c=sigma", 3}, // geocoded: never
        {"SCW", ":Calibration Type:Gamma", 4},
    };
    for (const Case &c : cases) {
        std::string xml = Make(c.type).productXml + c.suffix;
        DatasetKeeper handle(OpenDataset(xml.c_str(), "R"));
        ASSERT_NE(handle, nullptr) << xml;
        EXPECT_EQ(RawChanType(handle.get(), 1), c.code) << xml;
        int32_t width = 0, height = 0, channels = 0;
        RawSizeInfo(handle.get(), &width, &height, &channels);
        EXPECT_EQ(width, 16);
        EXPECT_EQ(height, 12);
        EXPECT_EQ(channels, 1);
    }
}

TEST_F(GeneratedProduct, open_refuses_bad_access_and_bad_choices) {
    std::string xml = Make("SGF").productXml;
    for (const char *access : {"rb", "w", ""}) {
        try {
            OpenDataset(xml.c_str(), access);
            ADD_FAILURE() << "access " << access << " opened";
        } catch (const host::ReportedError &error) {
            EXPECT_EQ(error.code, 43);
        }
    }
    try {
        OpenDataset((xml + "?c=Sigma0").c_str(), "r");
        FAIL() << "Sigma0 opened";
    } catch (const orv::Exception &error) {
        EXPECT_STREQ(error.what(),
                     "Calibration \"sigma0\" is invalid for a RADARSAT2 file");
    }
}

TEST_F(GeneratedProduct, failed_opens_leave_nothing_behind) {
    size_t handlesBefore = host::LiveHandleCount();
    int platformBefore = ORV_XMLUtil::InitializeCount();

    // An unrecognised product type is an exception out of open.
    std::string unknown = Make("XYZ").productXml;
    EXPECT_THROW(OpenDataset(unknown.c_str(), "r"), orv::Exception);
    // A multi-image SLC product of a mode without a class opens nothing.
    options.polarizations = {"HH", "HV"};
    options.acquisitionType = "Ultrafine";
    std::string noClass = Make("SLC").productXml;
    EXPECT_EQ(OpenDataset(noClass.c_str(), "r"), nullptr);
    // No product description at all.
    EXPECT_EQ(OpenDataset(folder.File("missing.xml").c_str(), "r"), nullptr);

    EXPECT_TRUE(OpenDatasets().empty());
    EXPECT_EQ(host::LiveHandleCount(), handlesBefore);
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), platformBefore);
}

TEST_F(GeneratedProduct, close_releases_the_dataset_and_its_image_files) {
    size_t handlesBefore = host::LiveHandleCount();
    std::string xml = Make("SGF").productXml;
    FILE *handle = OpenDataset(xml.c_str(), "r");
    ASSERT_NE(handle, nullptr);
    EXPECT_STREQ(fp2filename(handle), xml.c_str());
    // The dataset handle and its one image file are open.
    EXPECT_EQ(host::LiveHandleCount(), handlesBefore + 2);
    CloseDataset(handle);
    EXPECT_EQ(host::LiveHandleCount(), handlesBefore);
    EXPECT_TRUE(OpenDatasets().empty());
    CloseDataset(handle); // a second close does nothing
    EXPECT_EQ(host::LiveHandleCount(), handlesBefore);
}
