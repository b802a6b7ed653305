#include "product/CalibrationTables.hpp"

#include "host/ErrorReports.hpp"
#include "host/HostMemory.hpp"
#include "model/LookupTable.hpp"
#include "model/ProductVariants.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/CommandRun.hpp"
#include "tests/support/HostLists.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <cstdio>
#include <memory>
#include <string>
#include <vector>

namespace {

using host::HostText;
using rs2test::WriteFile;

const char kNoNameWarning[] =
    "The LUT file name can not be found in product.xml file.\n"
    "The image will be loaded without calibration";

// A product description that only names look-up tables; each entry is the
// attribute list and the file name of one lookupTable element.
std::string DescriptionNaming(
    const std::vector<std::pair<std::string, std::string>> &tables) {
    std::string xml = "<product><imageAttributes>";
    for (const auto &table : tables)
        xml += "<lookupTable " + table.first + ">" + table.second +
               "</lookupTable>";
    return xml + "</imageAttributes></product>\n";
}

std::vector<std::string> Entries(char **list) {
    return rs2test::ListTexts(host::HostList(list).get());
}

// A model whose product directory is the folder of productXml, as loading
// leaves it.
std::unique_ptr<ZirOdi2CalibImage> ModelFor(const std::string &productXml) {
    auto model = std::make_unique<RUZ2GrpcCR>();
    model->SetProductDirectory(productXml.c_str());
    return model;
}

TEST(CalibrationTables, look_up_table_file_packs_the_numbers_it_can_read) {
    struct Case {
        const char *file;
        float offset;
        std::vector<float> values;
    };
    const Case cases[] = {
        // A trailing space adds an empty last token.
        {"<lut><offset>2.5</offset><gains>1 2 3 4 </gains></lut>",
         2.5f,
         {1, 2, 3, 4, 0}},
        // The second token is no number.
        {"<lut><offset>0</offset><gains>1 x 2 3</gains></lut>",
         0.0f,
         {1, 2, 3, 0}},
        // No gains at all.
        {"<lut><offset>1</offset><gains></gains></lut>", 1.0f, {0}},
        // The offset element is missing.
        {"<lut><gains>5 6</gains></lut>", 0.0f, {5, 6}},
        // An offset that is no number; text after a number; two spaces.
        {"<lut><offset>abc</offset><gains>1.5e2abc  -3</gains></lut>",
         0.0f,
         {150, -3, 0}},
        // Leading white space inside a token is skipped; only spaces split.
        {"<lut><offset>-7.25</offset><gains>\t4 5</gains></lut>",
         -7.25f,
         {4, 5}},
        {"<lut><offset>0</offset><gains>1\t2 \n3 4\n</gains></lut>",
         0.0f,
         {1, 3, 4}},
        // Words, hexadecimal and out-of-range texts read as a stream reads
        // them.
        {"<lut><offset>0</offset><gains>inf 0x10 1e400 7</gains></lut>",
         0.0f,
         {0, 7, 0, 0}},
    };
    rs2test::TempDir dir;
    for (const Case &c : cases) {
        WriteFile(dir.File("lut.xml"), c.file);
        const std::unique_ptr<LookupTable> table =
            ReadLookupTableFile(dir.File("lut.xml").c_str());
        ASSERT_NE(table, nullptr) << c.file;
        EXPECT_EQ(table->Offset(), c.offset) << c.file;
        ASSERT_EQ(table->Size(), c.values.size()) << c.file;
        for (size_t i = 0; i < c.values.size(); ++i)
            EXPECT_EQ(table->Get(i), c.values[i]) << c.file << " entry " << i;
    }
}

TEST(CalibrationTables, look_up_table_file_without_document_gives_no_table) {
    rs2test::TempDir dir;
    EXPECT_EQ(ReadLookupTableFile(dir.File("absent.xml").c_str()), nullptr);
    EXPECT_EQ(ReadLookupTableFile(nullptr), nullptr);
    const char *const unreadable[] = {
        // Empty.
        "",
        // No XML at all.
        "1.0 2.0 3.0\n",
        // Cut before the gains.
        "<lut><offset>1</offset><ga",
        // Well-formed, but without gains.
        "<lut><offset>1</offset></lut>",
    };
    for (const char *file : unreadable) {
        WriteFile(dir.File("lut.xml"), file);
        EXPECT_EQ(ReadLookupTableFile(dir.File("lut.xml").c_str()), nullptr)
            << file;
    }
}

TEST(CalibrationTables, option_selects_table_of_its_kind) {
    rs2test::TempDir dir;
    rs2gen::ProductOptions options;
    options.width = 20;
    options.lutOffset = 1.25f;
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    DocumentParse parse(product.productXml.c_str());
    ASSERT_NE(parse.Document(), nullptr);

    struct Case {
        const char *option;
        const char *kind;
    };
    const Case cases[] = {
        {"gamma", "Gamma"},
        {"beta", "Beta Nought"},
        {"sigma", "Sigma Nought"},
        {nullptr, "Sigma Nought"},
    };
    for (const Case &c : cases) {
        host::ClearWarnings();
        auto model = ModelFor(product.productXml);
        LoadCalibration(parse.Document(), model.get(), c.option);
        EXPECT_STREQ(model->GetCalibrationType(), c.kind);
        EXPECT_TRUE(host::Warnings().empty()) << c.kind;
        const auto gains = rs2gen::LookupTableGains(options, c.kind);
        const LookupTable &table = model->CalibrationTable();
        EXPECT_EQ(table.Offset(), rs2gen::LookupTableOffset(options, c.kind));
        ASSERT_EQ(table.Size(), gains.size()) << c.kind;
        for (size_t i = 0; i < gains.size(); ++i)
            EXPECT_EQ(table.Get(i), gains[i]) << c.kind << " column " << i;
    }
}

TEST(CalibrationTables, kind_is_recorded_as_the_description_writes_it) {
    rs2test::TempDir dir;
    WriteFile(dir.File("product.xml"),
              DescriptionNaming({{"a=\"GAMMA\"", "lutGamma.xml"},
                                 {"a=\"SIGMA NOUGHT\"", "lutSigma.xml"}}));
    WriteFile(dir.File("lutSigma.xml"),
              "<lut><offset>0</offset><gains>7 8</gains></lut>");
    DocumentParse parse(dir.File("product.xml").c_str());
    auto model = ModelFor(dir.File("product.xml"));

    LoadCalibration(parse.Document(), model.get(), "sigma");
    EXPECT_STREQ(model->GetCalibrationType(), "SIGMA NOUGHT");
    EXPECT_EQ(model->CalibrationTable().Size(), 2u);
    EXPECT_EQ(model->CalibrationTable().Get(1), 8.0f);
}

TEST(CalibrationTables, missing_table_loads_without_calibration_and_warns) {
    rs2test::TempDir dir;
    struct Case {
        const char *what;
        std::string description;
        const char *table; // text of lutSigma.xml; null: no such file
        std::string warning;
    };
    const std::string sigmaOnly =
        DescriptionNaming({{"kind=\"Sigma Nought\"", "lutSigma.xml"}});
    const std::string unreadable =
        "The LUT file " + dir.File("lutSigma.xml") +
        " can not be read.\nThe image will be loaded without calibration";
    const Case cases[] = {
        {"no lookupTable element", DescriptionNaming({}), nullptr,
         kNoNameWarning},
        {"no attribute of the kind",
         DescriptionNaming({{"kind=\"Gamma\"", "lutGamma.xml"}}), nullptr,
         kNoNameWarning},
        {"the named file is absent", sigmaOnly, nullptr,
         "The specified LUT file " + dir.File("lutSigma.xml") +
             " can not be found in the directory.\n"
             "The image will be loaded without calibration"},
        {"the named file is no XML", sigmaOnly, "7 8 9\n", unreadable},
        {"the named file is cut short", sigmaOnly, "<lut><offset>0</off",
         unreadable},
        {"the named file has no gains", sigmaOnly,
         "<lut><offset>0</offset></lut>", unreadable},
        {"fewer gains than the declared columns",
         DescriptionNaming({{"kind=\"Sigma Nought\"", "lutSigma.xml"}})
             .insert(9, "<numberOfSamplesPerLine> 16 "
                        "</numberOfSamplesPerLine>"),
         "<lut><offset>0</offset><gains>2 2 2</gains></lut>",
         "The LUT file " + dir.File("lutSigma.xml") +
             " has 3 gains for 16 columns.\n"
             "The image will be loaded without calibration"},
    };
    for (const Case &c : cases) {
        WriteFile(dir.File("product.xml"), c.description);
        std::remove(dir.File("lutSigma.xml").c_str());
        if (c.table != nullptr)
            WriteFile(dir.File("lutSigma.xml"), c.table);
        DocumentParse parse(dir.File("product.xml").c_str());
        ASSERT_NE(parse.Document(), nullptr) << c.what;
        auto model = ModelFor(dir.File("product.xml"));
        host::ClearWarnings();

        LoadCalibration(parse.Document(), model.get(), "sigma");
        EXPECT_STREQ(model->GetCalibrationType(), "None") << c.what;
        EXPECT_EQ(model->CalibrationTable().Size(), 0u) << c.what;
        EXPECT_EQ(host::Warnings(), std::vector<std::string>{c.warning})
            << c.what;
    }
}

TEST(CalibrationTables, table_path_joins_product_directory_and_file_name) {
    rs2test::TempDir dir;
    WriteFile(dir.File("product.xml"),
              DescriptionNaming({{"x=\"1\" kind=\"Beta Nought\"", "b.xml"},
                                 {"kind=\"Sigma Nought\"", "s.xml"}}));
    DocumentParse parse(dir.File("product.xml").c_str());
    ASSERT_NE(parse.Document(), nullptr);

    auto model = ModelFor(dir.File("product.xml"));
    HostText beta(FindLookupTableFile(parse.Document(), model.get(), "beta"));
    ASSERT_NE(beta, nullptr);
    EXPECT_EQ(std::string(beta.get()), dir.File("b.xml"));
    EXPECT_EQ(FindLookupTableFile(parse.Document(), model.get(), nullptr),
              nullptr);
    EXPECT_EQ(FindLookupTableFile(parse.Document(), model.get(), "gamma"),
              nullptr);

    // Without a product directory the file name stands alone.
    RUZ2GrpcCR bare;
    HostText sigma(FindLookupTableFile(parse.Document(), &bare, "Sigma"));
    ASSERT_NE(sigma, nullptr);
    EXPECT_STREQ(sigma.get(), "s.xml");
}

TEST(CalibrationTables,
     calibration_types_list_sigma_nought_first_and_none_last) {
    struct Case {
        const char *what;
        std::vector<std::pair<std::string, std::string>> tables;
        std::vector<std::string> kinds;
    };
    const Case cases[] = {
        {"three kinds",
         {{"k=\"Beta Nought\"", "b.xml"},
          {"k=\"Sigma Nought\"", "s.xml"},
          {"k=\"Gamma\"", "g.xml"}},
         {"Sigma Nought", "Beta Nought", "Gamma", "None"}},
        {"Sigma Nought in another case is spelled the usual way",
         {{"k=\"gamma\"", "g.xml"}, {"k=\"sigma NOUGHT\"", "s.xml"}},
         {"Sigma Nought", "gamma", "None"}},
        {"every attribute counts, twice when written twice",
         {{"k=\"Gamma\" scale=\"dB\"", "g.xml"}, {"k=\"Gamma\"", "h.xml"}},
         {"Gamma", "dB", "Gamma", "None"}},
        {"no lookupTable element", {}, {"None"}},
    };
    rs2test::TempDir dir;
    for (const Case &c : cases) {
        WriteFile(dir.File("product.xml"), DescriptionNaming(c.tables));
        std::vector<std::string> expected;
        for (const std::string &kind : c.kinds)
            expected.push_back(":Calibration Type:" + kind);
        EXPECT_EQ(
            Entries(ListCalibrationTypes(dir.File("product.xml").c_str())),
            expected)
            << c.what;
    }
    // No document, no list.
    EXPECT_EQ(ListCalibrationTypes(nullptr), nullptr);
    EXPECT_EQ(ListCalibrationTypes(dir.File("absent.xml").c_str()), nullptr);
}

// The image's own width decides, not the width the description declares.
TEST(CalibrationTables, table_shorter_than_the_image_is_not_applied) {
    rs2test::TempDir dir;
    rs2gen::ProductOptions options;
    options.width = 20;
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    std::string description = rs2test::FileText(product.productXml);
    const std::string declared = "<numberOfSamplesPerLine>20<";
    ASSERT_NE(description.find(declared), std::string::npos);
    description.replace(description.find(declared), declared.size(),
                        "<numberOfSamplesPerLine>5<");
    WriteFile(product.productXml, description);
    std::string gains = "1";
    for (int i = 1; i < 19; ++i)
        gains += " 1";
    WriteFile(dir.File("lutSigma.xml"),
              "<lut><offset>0</offset><gains>" + gains + "</gains></lut>");
    host::ClearWarnings();
    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model(
        LoadProduct(reader, product.productXml.c_str(), "sigma"));
    ASSERT_NE(model, nullptr);
    EXPECT_STREQ(model->GetCalibrationType(), "None");
    EXPECT_EQ(model->CalibrationTable().Size(), 0u);
    EXPECT_EQ(host::Warnings(),
              std::vector<std::string>{
                  "The LUT file " + dir.File("lutSigma.xml") +
                  " has 19 gains for 20 columns.\n"
                  "The image will be loaded without calibration"});
}

} // namespace
