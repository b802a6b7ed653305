#include "host/HostMemory.hpp"
#include "model/LookupTable.hpp"
#include "tests/support/LoadedProduct.hpp"
#include "tests/support/TestFiles.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <string>
#include <vector>

namespace {

using rs2test::LoadedProduct;

// What the incidence-angle segment hands out.
struct IncidenceArray {
    int32_t dimensions = -1;
    int32_t count = -1;
    std::unique_ptr<double[], host::FreeDeleter> values;
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
    rs2test::WriteFile(path, "<lut><offset>0</offset><gains>" + gains +
                                 "</gains></lut>\n");
}

// With the option "sigma" the calibration and the incidence angles share
// the Sigma table file; each must still get the whole of it.
TEST(IncidenceArray, angles_of_generated_products_follow_their_geometry) {
    for (const char *type : {"SGF", "SLC"}) {
        SCOPED_TRACE(type);
        const auto options = Options(type, 64);
        LoadedProduct loaded(options, "sigma");
        ASSERT_NE(loaded.model, nullptr);
        const std::vector<float> gains =
            rs2gen::LookupTableGains(options, "Sigma Nought");
        const LookupTable &table = loaded.model->CalibrationTable();
        ASSERT_EQ(table.Size(), gains.size());
        for (size_t k = 0; k < gains.size(); ++k)
            EXPECT_EQ(table.Get(k), gains[k]) << "gain " << k;

        const IncidenceArray array = ReadIncidenceArray(*loaded.model);
        EXPECT_EQ(array.dimensions, 1);
        EXPECT_STREQ(array.name, "Incidence Angle Map");
        ASSERT_EQ(array.count, options.width);
        for (int column = 0; column < options.width; ++column)
            EXPECT_NEAR(array.values[column],
                        rs2gen::IncidenceAngleDegrees(options, column), 1e-3)
                << "column " << column;
    }
}

TEST(IncidenceArray, angle_comes_from_ratio_of_beta_to_sigma_gain) {
    struct Case {
        const char *type;
        const char *sigmaGains; // null: no table files at all
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
        // Without tables every column reports 1.
        {"SGF", nullptr, nullptr, {1.0, 1.0, 1.0, 1.0}},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(std::string(c.type) + " " +
                     (c.betaGains ? c.betaGains : "no tables"));
        auto options = Options(c.type, 4);
        options.lookupTables = c.sigmaGains != nullptr;
        LoadedProduct loaded(options, nullptr, [&](const auto &product) {
            if (!options.lookupTables)
                return;
            WriteLookupTable(product.directory + "/lutSigma.xml", c.sigmaGains);
            WriteLookupTable(product.directory + "/lutBeta.xml", c.betaGains);
        });
        ASSERT_NE(loaded.model, nullptr);

        const IncidenceArray array = ReadIncidenceArray(*loaded.model);
        ASSERT_EQ(array.count, 4);
        for (size_t k = 0; k < c.expected.size(); ++k) {
            if (std::isnan(c.expected[k]))
                EXPECT_TRUE(std::isnan(array.values[k])) << "column " << k;
            else
                EXPECT_NEAR(array.values[k], c.expected[k], 1e-4)
                    << "column " << k;
        }
    }
}

TEST(IncidenceArray, name_is_optional) {
    LoadedProduct loaded(Options("SGF", 12), nullptr);
    ASSERT_NE(loaded.model, nullptr);
    int32_t dimensions = 0, count = 0;
    double *values = nullptr;
    loaded.model->IncidenceArraySegment(&dimensions, &count, &values, nullptr);
    const std::unique_ptr<double[], host::FreeDeleter> owner(values);
    EXPECT_EQ(dimensions, 1);
    EXPECT_EQ(count, 12);
}

TEST(IncidenceArray, dataset_without_first_image_takes_the_next_images_width) {
    // HH and VH only: channel 1 shows VV, which has no image file; channel
    // 2's image gives the dataset its size.
    auto options = Options("SGF", 8);
    options.polarizations = {"HH", "VH"};
    LoadedProduct loaded(options, nullptr);
    ASSERT_NE(loaded.model, nullptr);

    const IncidenceArray array = ReadIncidenceArray(*loaded.model);
    EXPECT_EQ(array.dimensions, 1);
    EXPECT_EQ(array.count, 8);
}

} // namespace
