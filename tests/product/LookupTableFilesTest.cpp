#include "product/CalibrationTables.hpp"

#include "model/LookupTable.hpp"
#include "model/ProductVariants.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <fstream>
#include <locale>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace {

void WriteText(const std::string &path, const std::string &text) {
    std::ofstream(path) << text;
}

std::string TableFile(const std::string &gains) {
    return "<lut><offset>0.5</offset><gains>" + gains + "</gains></lut>\n";
}

// The gains as they have always been read: split at every space, each token
// through an istringstream in the classic locale, the numbers packed from
// entry 0 and the entries left over 0.
std::vector<float> GainsReadWithStream(const std::string &gains) {
    const std::vector<std::string> tokens = SplitTokens(gains, " ");
    std::vector<float> values(tokens.size(), 0.0f);
    std::size_t k = 0;
    for (const std::string &token : tokens) {
        std::istringstream stream(token);
        stream.imbue(std::locale::classic());
        float value = 0.0f;
        if (stream >> value)
            values[k++] = value;
    }
    return values;
}

std::vector<float> Values(const LookupTable &table) {
    std::vector<float> values;
    for (std::size_t i = 0; i < table.Size(); ++i)
        values.push_back(table.Get(i));
    return values;
}

TEST(LookupTableFiles, gains_are_read_token_by_token_as_stream_input_reads) {
    const std::string lists[] = {
        "1.5 2 3",
        // Empty tokens at either end and between two spaces.
        " 1  2 ",
        "",
        " ",
        // White space other than spaces stays inside a token.
        "1\t2 \n3 4\n",
        // Tokens without a number, with text after one, and out of range.
        "3abc abc +4 -5e-1 inf nan 0x10 .5 1e400 1e 7",
        "2.789318e+02 2.789294e+02 2.789270e+02",
    };
    rs2test::TempDir dir;
    const std::string path = dir.File("lut.xml");
    for (const std::string &gains : lists) {
        WriteText(path, TableFile(gains));
        const std::unique_ptr<LookupTable> table =
            ReadLookupTableFile(path.c_str());
        ASSERT_NE(table, nullptr) << "\"" << gains << "\"";
        EXPECT_EQ(Values(*table), GainsReadWithStream(gains))
            << "\"" << gains << "\"";
        EXPECT_EQ(table->Offset(), 0.5f);
    }
}

TEST(LookupTableFiles, a_file_is_parsed_once_per_load) {
    rs2test::TempDir dir;
    const std::string path = dir.File("lutSigma.xml");
    WriteText(path, TableFile("1 2 3"));
    LookupTableFiles files;
    const LookupTable *first = files.Read(path.c_str());
    ASSERT_NE(first, nullptr);
    // A second request is served from the first reading, even after the file
    // changed.
    WriteText(path, TableFile("4 5"));
    EXPECT_EQ(files.Read(path.c_str()), first);
    EXPECT_EQ(Values(*first), (std::vector<float>{1, 2, 3}));
    // Another set of files reads the file anew.
    LookupTableFiles later;
    const LookupTable *again = later.Read(path.c_str());
    ASSERT_NE(again, nullptr);
    EXPECT_EQ(Values(*again), (std::vector<float>{4, 5}));
}

TEST(LookupTableFiles, a_file_without_a_table_gives_none_each_time) {
    rs2test::TempDir dir;
    LookupTableFiles files;
    EXPECT_EQ(files.Read(nullptr), nullptr);
    const std::string absent = dir.File("absent.xml");
    EXPECT_EQ(files.Read(absent.c_str()), nullptr);
    EXPECT_EQ(files.Read(absent.c_str()), nullptr);
    const std::string broken = dir.File("broken.xml");
    // Cut short before the gains.
    WriteText(broken, "<lut><offset>1</offset><ga");
    EXPECT_EQ(files.Read(broken.c_str()), nullptr);
}

// With the option "sigma" the calibration and the incidence angles share
// the Sigma table; each must still get the whole of it.
TEST(LookupTableFiles, sigma_calibration_and_incidence_angles_share_a_file) {
    for (const char *type : {"SGF", "SLC"}) {
        SCOPED_TRACE(type);
        rs2test::TempDir dir;
        rs2gen::ProductOptions options;
        options.productType = type;
        options.width = 40;
        options.height = 8;
        const rs2gen::GeneratedProduct product =
            rs2gen::GenerateProduct(dir.Path(), options);
        ProductReader reader;
        const std::unique_ptr<ZirOdi2CalibImage> model(
            LoadProduct(reader, product.productXml.c_str(), "sigma"));
        ASSERT_NE(model, nullptr);
        EXPECT_STREQ(model->GetCalibrationType(), "Sigma Nought");
        EXPECT_EQ(Values(model->CalibrationTable()),
                  rs2gen::LookupTableGains(options, "Sigma Nought"));
        ASSERT_EQ(model->IncidenceTable().Size(),
                  static_cast<std::size_t>(options.width));
        for (int column = 0; column < options.width; ++column)
            EXPECT_NEAR(model->IncidenceTable().Get(column),
                        rs2gen::IncidenceAngleDegrees(options, column), 1e-3)
                << column;
    }
}

} // namespace
