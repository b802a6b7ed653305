#include "model/ZirOdi2CalibImage.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

namespace {

// A product loaded the way the open operation loads it; the reader outlives
// the model, which borrows from it.
struct LoadedProduct {
    explicit LoadedProduct(const std::string &productXml)
        : model(LoadProduct(reader, productXml.c_str(), nullptr)) {}
    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model;
};

struct FreeDeleter {
    void operator()(void *memory) const { std::free(memory); }
};

// What the incidence-angle segment hands out.
struct IncidenceArray {
    int32_t dimensions = -1;
    int32_t count = -1;
    std::unique_ptr<double[], FreeDeleter> values;
    char name[32] = {};
};

IncidenceArray ReadIncidenceArray(ZirOdi2CalibImage &model) {
    IncidenceArray array;
    double *values = nullptr;
    model.IncidenceArraySegment(&array.dimensions, &array.count, &values,
                                array.name);
    array.values.reset(values);
    return array;
}

rs2gen::ProductOptions Options(const std::string &type, int width) {
    rs2gen::ProductOptions options;
    options.productType = type;
    options.width = width;
    options.height = 6;
    options.rationalFunctions = false;
    options.tieGridColumns = std::min(width, 4);
    options.tieGridRows = 4;
    return options;
}

void WriteLookupTable(const std::string &path, const std::string &gains) {
    std::ofstream(path) << "<lut><offset>0</offset><gains>" << gains
                        << "</gains></lut>\n";
}

TEST(IncidenceArray, angles_of_generated_products_follow_their_geometry) {
    for (const char *type : {"SGF", "SLC"}) {
        rs2test::TempDir dir;
        const auto options = Options(type, 64);
        const auto product = rs2gen::GenerateProduct(dir.Path(), options);
        LoadedProduct loaded(product.productXml);
        ASSERT_NE(loaded.model, nullptr) << type;

        const IncidenceArray array = ReadIncidenceArray(*loaded.model);
        EXPECT_EQ(array.dimensions, 1) << type;
        EXPECT_STREQ(array.name, "Incidence Angle Map") << type;
        ASSERT_EQ(array.count, options.width) << type;
        for (int column = 0; column < options.width; ++column)
            EXPECT_NEAR(array.values[column],
                        rs2gen::IncidenceAngleDegrees(options, column), 1e-3)
                << type << " column " << column;
    }
}

TEST(IncidenceArray, angle_comes_from_ratio_of_beta_to_sigma_gain) {
    struct Case {
        const char *type;
        const char *sigmaGains;
        const char *betaGains;
        std::vector<double> expected; // one per image column
    };
    const double nan = std::nan("");
    const Case cases[] = {
        // Beta half of Sigma; the image is wider than the tables.
        {"SGF", "2 4 8", "1 2 4", {30.0, 30.0, 30.0, 1.0}},
        // SLC gains divide amplitudes: the sine is the squared ratio.
        {"SLC", "2 4 8", "1 2 4", {14.4775, 14.4775, 14.4775, 1.0}},
        // A short Beta table reads 1.0 past its end.
        {"SGF", "2 4 8 1", "1", {30.0, 14.4775, 7.1808, 90.0}},
        // A ratio above 1 has no angle.
        {"SGF", "1 1 1 1", "2 0 -1 1", {nan, 0.0, -90.0, 90.0}},
    };
    for (const Case &c : cases) {
        rs2test::TempDir dir;
        const auto options = Options(c.type, 4);
        const auto product = rs2gen::GenerateProduct(dir.Path(), options);
        WriteLookupTable(dir.File("lutSigma.xml"), c.sigmaGains);
        WriteLookupTable(dir.File("lutBeta.xml"), c.betaGains);
        LoadedProduct loaded(product.productXml);
        ASSERT_NE(loaded.model, nullptr) << c.type;

        const IncidenceArray array = ReadIncidenceArray(*loaded.model);
        ASSERT_EQ(array.count, 4);
        for (size_t k = 0; k < c.expected.size(); ++k) {
            if (std::isnan(c.expected[k]))
                EXPECT_TRUE(std::isnan(array.values[k]))
                    << c.type << " " << c.betaGains << " column " << k;
            else
                EXPECT_NEAR(array.values[k], c.expected[k], 1e-4)
                    << c.type << " " << c.betaGains << " column " << k;
        }
    }
}

TEST(IncidenceArray, product_without_tables_reports_one_for_every_column) {
    rs2test::TempDir dir;
    auto options = Options("SGF", 12);
    options.lookupTables = false;
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml);
    ASSERT_NE(loaded.model, nullptr);

    // The name is optional.
    int32_t dimensions = 0;
    int32_t count = 0;
    double *values = nullptr;
    loaded.model->IncidenceArraySegment(&dimensions, &count, &values, nullptr);
    const std::unique_ptr<double[], FreeDeleter> owner(values);
    EXPECT_EQ(dimensions, 1);
    ASSERT_EQ(count, 12);
    for (int k = 0; k < count; ++k)
        EXPECT_EQ(values[k], 1.0) << k;
}

TEST(IncidenceArray, dataset_without_first_image_has_empty_array) {
    rs2test::TempDir dir;
    // HH and VH only: channel 1 shows VV, which has no image file.
    auto options = Options("SGF", 8);
    options.polarizations = {"HH", "VH"};
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml);
    ASSERT_NE(loaded.model, nullptr);

    const IncidenceArray array = ReadIncidenceArray(*loaded.model);
    EXPECT_EQ(array.dimensions, 1);
    EXPECT_EQ(array.count, 0);
    EXPECT_NE(array.values, nullptr);
}

} // namespace
