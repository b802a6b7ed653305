#include "model/ProductVariants.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace {

constexpr int32_t kNone = -1; // a channel without a band
constexpr int32_t kHH = static_cast<int32_t>(Polarization::HH);
constexpr int32_t kVH = static_cast<int32_t>(Polarization::VH);
constexpr int32_t kHV = static_cast<int32_t>(Polarization::HV);
constexpr int32_t kVV = static_cast<int32_t>(Polarization::VV);
constexpr int32_t kDetected = static_cast<int32_t>(SampleKind::Detected);
constexpr int32_t kComplex = static_cast<int32_t>(SampleKind::Complex);

std::string TakeText(char *text) {
    std::string copy = text != nullptr ? text : "<null>";
    std::free(text);
    return copy;
}

using Factory = std::function<std::unique_ptr<ZirOdi2CalibImage>()>;

template <class Variant> Factory Of() {
    return [] { return std::make_unique<Variant>(); };
}

struct ExpectedChannel {
    int32_t polarization; // of the band it reads, or kNone
    const char *description;
};

struct LayoutCase {
    const char *name;
    Factory make;
    std::vector<int32_t> bands;
    int32_t kind;
    std::vector<ExpectedChannel> channels;
    const char *polarizationText;
    const char *matrixType;
};

void CheckLayout(const LayoutCase &c) {
    SCOPED_TRACE(c.name);
    std::unique_ptr<ZirOdi2CalibImage> model = c.make();
    for (int32_t code : c.bands)
        model->AddBand(code, "image.tif");
    ASSERT_EQ(model->ChannelCount(), static_cast<int32_t>(c.channels.size()));
    for (size_t i = 0; i < c.channels.size(); ++i) {
        const ChannelRecord *channel =
            model->FindChannel(static_cast<int32_t>(i + 1));
        ASSERT_NE(channel, nullptr);
        const ExpectedChannel &expected = c.channels[i];
        if (expected.polarization == kNone)
            EXPECT_EQ(channel->band, nullptr) << "channel " << i + 1;
        else
            EXPECT_EQ(channel->band, model->FindBand(expected.polarization))
                << "channel " << i + 1;
        EXPECT_STREQ(channel->description, expected.description);
        EXPECT_EQ(channel->kind, c.kind);
        EXPECT_EQ(channel->bandChannel, 1);
    }
    EXPECT_EQ(TakeText(model->PolarizationText()), c.polarizationText);
    EXPECT_EQ(TakeText(model->MatrixType()), c.matrixType);
}

TEST(ProductVariants, single_layouts_follow_the_band_present) {
    const LayoutCase cases[] = {
        {"SLC HH",
         Of<ZirOdi2SLC>(),
         {kHH},
         kComplex,
         {{kHH, "Matrix_Element: _1_1"}},
         "HH",
         "s1c"},
        {"SLC VV",
         Of<ZirOdi2SLC>(),
         {kVV},
         kComplex,
         {{kVV, "Matrix_Element: _2_2"}},
         "VV",
         "s1c"},
        {"SLC HV",
         Of<ZirOdi2SLC>(),
         {kHV},
         kComplex,
         {{kHV, "Matrix_Element: _1_2"}},
         "HV",
         "s1c"},
        {"ground range VV",
         Of<RUZ2GrpcCR>(),
         {kVV},
         kDetected,
         {{kVV, "Matrix_Element: _4_4"}},
         "VV",
         "c1r"},
        {"geocoded VH",
         Of<RUZ2GeocCR>(),
         {kVH},
         kDetected,
         {{kVH, "Matrix_Element: _3_3"}},
         "VH",
         "c1r"},
        // With no band at all the channel still exists, unnamed.
        {"ground range empty",
         Of<RUZ2GrpcCR>(),
         {},
         kDetected,
         {{kNone, "Matrix_Element: "}},
         "",
         "c1r"},
        // Two bands: channel 1 reads the lowest code (VH), while its name
        // follows the search order HH, HV, VH, VV (HV first).
        {"geocoded VH+HV",
         Of<RUZ2GeocCR>(),
         {kHV, kVH},
         kDetected,
         {{kVH, "Matrix_Element: _2_2"}},
         "VHHV",
         "c1r"},
    };
    for (const LayoutCase &c : cases)
        CheckLayout(c);
}

TEST(ProductVariants, dual_layouts_pick_a_pair_even_without_its_images) {
    const LayoutCase cases[] = {
        {"HH HV VV takes HH/VV",
         Of<RUZ2GrpC2R>(),
         {kHH, kHV, kVV},
         kDetected,
         {{kHH, "Matrix_Element: _1_1"}, {kVV, "Matrix_Element: _4_4"}},
         "HH, VV",
         "c2r"},
        {"HH HV",
         Of<RUZ2GeocC2R>(),
         {kHH, kHV},
         kDetected,
         {{kHH, "Matrix_Element: _1_1"}, {kHV, "Matrix_Element: _2_2"}},
         "HH, HV",
         "c2r"},
        {"HH VH takes VV/VH",
         Of<RUZ2GrpC2R>(),
         {kHH, kVH},
         kDetected,
         {{kNone, "Matrix_Element: _4_4"}, {kVH, "Matrix_Element: _3_3"}},
         "VV, VH",
         "c2r"},
        {"SLC VV VH",
         Of<ZirOdi2SLCS2C>(),
         {kVV, kVH},
         kComplex,
         {{kVV, "Matrix_Element: _2_2"}, {kVH, "Matrix_Element: _2_1"}},
         "VV, VH",
         "s2c"},
        {"SLC HH HV",
         Of<ZirOdi2SLCS2C>(),
         {kHH, kHV},
         kComplex,
         {{kHH, "Matrix_Element: _1_1"}, {kHV, "Matrix_Element: _1_2"}},
         "HH, HV",
         "s2c"},
        {"no bands",
         Of<ZirOdi2SLCS2C>(),
         {},
         kComplex,
         {{kNone, "Matrix_Element: _2_2"}, {kNone, "Matrix_Element: _2_1"}},
         "VV, VH",
         "s2c"},
    };
    for (const LayoutCase &c : cases)
        CheckLayout(c);
}

TEST(ProductVariants, quad_layouts_always_present_four_channels) {
    const LayoutCase cases[] = {
        {"ground range without VH",
         Of<RUZ2GrpC4R>(),
         {kHH, kHV, kVV},
         kDetected,
         {{kHH, "Matrix_Element: _1_1"},
          {kHV, "Matrix_Element: _2_2"},
          {kNone, "Matrix_Element: _3_3"},
          {kVV, "Matrix_Element: _4_4"}},
         "HH, HV, VH, VV",
         "c4r"},
        {"geocoded complete",
         Of<RUZ2GeocC4R>(),
         {kVV, kVH, kHV, kHH},
         kDetected,
         {{kHH, "Matrix_Element: _1_1"},
          {kHV, "Matrix_Element: _2_2"},
          {kVH, "Matrix_Element: _3_3"},
          {kVV, "Matrix_Element: _4_4"}},
         "HH, HV, VH, VV",
         "c4r"},
        {"SLC complete",
         Of<ZirOdi2SLCS4C>(),
         {kHH, kHV, kVH, kVV},
         kComplex,
         {{kHH, "Matrix_Element: _1_1"},
          {kHV, "Matrix_Element: _1_2"},
          {kVH, "Matrix_Element: _2_1"},
          {kVV, "Matrix_Element: _2_2"}},
         "HH, HV, VH, VV",
         "s4c"},
    };
    for (const LayoutCase &c : cases)
        CheckLayout(c);
}

// A plane of width x height samples whose value tells its row and column.
std::vector<float> Plane(int width, int height) {
    std::vector<float> plane;
    for (int r = 0; r < height; ++r)
        for (int c = 0; c < width; ++c)
            plane.push_back(static_cast<float>(1 + c + 7 * r));
    return plane;
}

TEST(ProductVariants,
     detected_calibration_uses_the_gain_of_the_product_column) {
    const int kWidth = 5, kHeight = 3, kColumns = 103;
    struct Case {
        const char *name;
        Factory make;
        int32_t xOffset;
        float offset;
    } cases[] = {
        {"ground range at column 100", Of<RUZ2GrpC2R>(), 100, 0.0f},
        {"geocoded at column 0 with offset", Of<RUZ2GeocCR>(), 0, 12.5f},
        // The window reaches beyond the table: those columns take gain 1.
        {"ground range past the table", Of<RUZ2GrpcCR>(), 100, 3.0f},
        {"before the first column", Of<RUZ2GrpcCR>(), -2, 0.0f},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.name);
        std::unique_ptr<ZirOdi2CalibImage> model = c.make();
        model->ResizeCalibrationTable(kColumns);
        for (int i = 0; i < kColumns; ++i)
            model->SetCalibrationValue(i, 100.0f + 2.0f * i);
        model->SetCalibrationOffset(c.offset);
        std::vector<float> samples = Plane(kWidth, kHeight);
        // The row offset plays no part.
        model->CalibrateDetected(c.xOffset, 977, kWidth, kHeight,
                                 samples.data());
        std::vector<float> original = Plane(kWidth, kHeight);
        for (int r = 0; r < kHeight; ++r) {
            for (int col = 0; col < kWidth; ++col) {
                int column = c.xOffset + col;
                float gain = column >= 0 && column < kColumns
                                 ? 100.0f + 2.0f * column
                                 : 1.0f;
                float s = original[r * kWidth + col];
                EXPECT_NEAR(samples[r * kWidth + col],
                            (s * s + c.offset) / gain,
                            1e-6f * (s * s + c.offset))
                    << "row " << r << " column " << col;
            }
        }
    }
}

TEST(ProductVariants, detected_calibration_without_table_or_plane) {
    RUZ2GrpcCR model;
    std::vector<float> samples = Plane(4, 2);
    model.CalibrateDetected(0, 0, 4, 2, samples.data());
    std::vector<float> original = Plane(4, 2);
    for (size_t k = 0; k < samples.size(); ++k)
        EXPECT_FLOAT_EQ(samples[k], original[k] * original[k]);
    // Nothing to do, and nothing written.
    model.CalibrateDetected(0, 0, 4, 2, nullptr);
    std::vector<float> untouched = Plane(4, 2);
    model.CalibrateDetected(0, 0, 0, 2, untouched.data());
    model.CalibrateDetected(0, 0, -4, 2, untouched.data());
    EXPECT_EQ(untouched, Plane(4, 2));
}

TEST(ProductVariants, complex_calibration_divides_by_the_gain) {
    ZirOdi2SLCS2C model;
    model.ResizeCalibrationTable(20);
    for (int i = 0; i < 20; ++i)
        model.SetCalibrationValue(i, 1.0f + i);
    model.SetCalibrationOffset(1000.0f); // not used by complex products
    std::vector<float> samples = Plane(3, 2);
    model.CalibrateDetected(16, 0, 3, 2, samples.data());
    std::vector<float> original = Plane(3, 2);
    for (int r = 0; r < 2; ++r)
        for (int col = 0; col < 3; ++col) {
            float gain = col + 16 < 20 ? 1.0f + (col + 16) : 1.0f;
            EXPECT_NEAR(samples[r * 3 + col], original[r * 3 + col] / gain,
                        1e-6f)
                << r << "," << col;
        }
}

TEST(ProductVariants, complex_pairs_combine_to_power_only_when_calibrated) {
    const std::vector<float> i = {3.0f, -1.0f, 0.0f, 2.0f};
    const std::vector<float> q = {4.0f, 1.0f, -5.0f, 0.5f};
    struct Case {
        const char *calibration; // null: never set
        bool power;
    } cases[] = {{nullptr, false},
                 {"None", false},
                 {"none", false},
                 {"Sigma Nought", true},
                 {"Gamma", true}};
    for (const Case &c : cases) {
        ZirOdi2SLC model;
        if (c.calibration != nullptr)
            model.SetCalibrationType(c.calibration);
        std::vector<float> result(4, -1.0f);
        model.CombineComplex(i.data(), q.data(), 2, 2, result.data());
        for (size_t k = 0; k < 4; ++k) {
            float sum = i[k] * i[k] + q[k] * q[k];
            EXPECT_NEAR(result[k], c.power ? sum : std::sqrt(sum), 1e-6f)
                << (c.calibration ? c.calibration : "null") << " " << k;
        }
    }
    // Detected products have no pair to combine.
    RUZ2GrpC2R detected;
    detected.SetCalibrationType("Sigma Nought");
    std::vector<float> result(4, -1.0f);
    detected.CombineComplex(i.data(), q.data(), 2, 2, result.data());
    EXPECT_EQ(result, std::vector<float>(4, -1.0f));
}

} // namespace
