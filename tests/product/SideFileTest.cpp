#include "product/SideFile.hpp"

#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "product/ProductReader.hpp"
#include "product/StringListKeeper.hpp"
#include "tests/support/HostLists.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

// The entries of the side file written beside a product description, in
// list order, as "KEY: VALUE" texts.
class SideFileRead {
  public:
    explicit SideFileRead(const std::string *content) {
        if (content != nullptr)
            rs2test::WriteFile(dir.File("ProductDescription.self"), *content);
        reader.productPath = HString(dir.File("product.xml").c_str());
        list.Reset(ReadSideFile(reader));
    }

    char **List() const { return list.Get(); }
    std::vector<std::string> Entries() const {
        return rs2test::ListTexts(list.Get());
    }

  private:
    rs2test::TempDir dir;
    ProductReader reader;
    StringListKeeper list;
};

std::vector<std::string> ReadEntries(const std::string &content) {
    return SideFileRead(&content).Entries();
}

TEST(SideFile, sections_prefix_keys_and_start_and_end_times_are_renamed) {
    EXPECT_EQ(ReadEntries("productInfo=\n"
                          "    productType = SGF;\n"
                          "sourceInfo=\n"
                          "    startTime = 2010-05-01T10:20:30.000000Z;\n"
                          "    endTime = 2010-05-01T10:20:40.000000Z;\n"
                          "satellite = RADARSAT-2;\n"),
              (std::vector<std::string>{
                  "productInfo_productType: SGF",
                  "Acquisition_StartTime: 2010-05-01T10:20:30.000000Z",
                  "Acquisition_EndTime: 2010-05-01T10:20:40.000000Z",
                  "sourceInfo_satellite: RADARSAT-2"}));
}

TEST(SideFile, line_rules) {
    struct Case {
        const char *comment;
        std::string content;
        std::vector<std::string> expected;
    };
    const Case cases[] = {
        {"a value of spaces before ';' is an empty entry, not a section",
         "s=\nblank =   ;\nkey = 1;\n",
         {"s_blank: ", "s_key: 1"}},
        {"bands and bandsInArchive lines change no section",
         "s=\nbands=\nbandsInArchive = 2;\nbands = HH HV;\nkey = 1;\n",
         {"s_key: 1"}},
        {"#text lines are dropped", "#text = x;\nkey = 1;\n", {"key: 1"}},
        {"a leading '=' gives an entry with an empty key",
         "=value;\n",
         {": value"}},
        {"a bare '=' opens an unnamed section, so no prefix follows",
         "s=\n=\nkey = 1;\n",
         {"key: 1"}},
        {"text after ';' is dropped, missing ';' keeps the whole rest",
         "a = 1; comment\nb = x=y\n",
         {"a: 1", "b: x=y"}},
        {"carriage returns, tabs and blank lines are white space",
         "s=\r\n\r\n\tkey\t=\t1;\r\n\n",
         {"s_key: 1"}},
        {"a later line of the same key replaces the value in place",
         "a = 1;\nb = 2;\na = 3;\n",
         {"a: 3", "b: 2"}},
        {"the renames apply to the joined key only",
         "startTime = t;\nx=\nsourceInfo_startTime = u;\n",
         {"startTime: t", "x_sourceInfo_startTime: u"}},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.comment);
        EXPECT_EQ(ReadEntries(c.content), c.expected);
    }
}

TEST(SideFile, no_entry_gives_no_list) {
    const std::string noEquals = "just text\nand more\n";
    EXPECT_EQ(SideFileRead(&noEquals).List(), nullptr);
    const std::string sectionsOnly = "a=\nb=\n";
    EXPECT_EQ(SideFileRead(&sectionsOnly).List(), nullptr);
    const std::string empty;
    EXPECT_EQ(SideFileRead(&empty).List(), nullptr);
    EXPECT_EQ(SideFileRead(nullptr).List(), nullptr); // no side file
}

TEST(SideFile, reader_without_a_product_path_reads_nothing) {
    ProductReader reader;
    EXPECT_EQ(ReadSideFile(reader), nullptr);
}

TEST(SideFile, extended_information_of_the_product_path_is_ignored) {
    rs2test::TempDir dir;
    rs2test::WriteFile(dir.File("ProductDescription.self"), "key = 1;\n");
    ProductReader reader;
    reader.productPath =
        HString((dir.File("product.xml") + ":Calibration Type:Gamma").c_str());
    StringListKeeper list(ReadSideFile(reader));
    EXPECT_STREQ(list.Fetch("key"), "1");
}

} // namespace
