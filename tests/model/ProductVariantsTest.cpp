#include "model/ProductVariants.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <functional>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace {

using Factory = std::function<std::unique_ptr<ZirOdi2CalibImage>()>;

template <class Variant> Factory Of() {
    return [] { return std::make_unique<Variant>(); };
}

std::string TakeText(char *text) {
    std::string copy = text != nullptr ? text : "<null>";
    std::free(text);
    return copy;
}

// The code of a polarization name; -1 for "-", no band.
int32_t Code(const std::string &name) {
    const std::string names[] = {"HH", "VH", "HV", "VV"}; // in code order
    for (int32_t code = 0; code < 4; ++code)
        if (names[code] == name)
            return code;
    return -1;
}

std::vector<std::string> Words(const std::string &text) {
    std::istringstream in(text);
    std::vector<std::string> words;
    for (std::string word; in >> word;)
        words.push_back(word);
    return words;
}

TEST(ProductVariants, channel_layouts_follow_the_bands_present) {
    struct Case {
        Factory make;
        const char *bands;
        // Per channel "band:element": the polarization of the band it reads
        // ("-" for none) and its matrix element.
        const char *channels;
        const char *polarizationText;
        const char *matrixType; // "s..." complex, "c..." detected
    };
    // clang-format off
    const Case cases[] = {
        {Of<ZirOdi2SLC>(), "HH", "HH:_1_1", "HH", "s1c"},
        {Of<ZirOdi2SLC>(), "VV", "VV:_2_2", "VV", "s1c"},
        {Of<ZirOdi2SLC>(), "HV", "HV:_1_2", "HV", "s1c"},
        {Of<RUZ2GrpcCR>(), "VV", "VV:_4_4", "VV", "c1r"},
        {Of<RUZ2GeocCR>(), "VH", "VH:_3_3", "VH", "c1r"},
        // With no band at all the channel still exists, unnamed.
        {Of<RUZ2GrpcCR>(), "", "-:", "", "c1r"},
        // Two bands: channel 1 reads the lowest code (VH), while its name
        // follows the search order HH, HV, VH, VV (HV first).
        {Of<RUZ2GeocCR>(), "HV VH", "VH:_2_2", "VHHV", "c1r"},
        // A dual layout picks a pair, even one whose images are missing.
        {Of<RUZ2GrpC2R>(), "HH HV VV", "HH:_1_1 VV:_4_4", "HH, VV", "c2r"},
        {Of<RUZ2GeocC2R>(), "HH HV", "HH:_1_1 HV:_2_2", "HH, HV", "c2r"},
        {Of<RUZ2GrpC2R>(), "HH VH", "-:_4_4 VH:_3_3", "VV, VH", "c2r"},
        {Of<ZirOdi2SLCS2C>(), "VV VH", "VV:_2_2 VH:_2_1", "VV, VH", "s2c"},
        {Of<ZirOdi2SLCS2C>(), "HH HV", "HH:_1_1 HV:_1_2", "HH, HV", "s2c"},
        {Of<ZirOdi2SLCS2C>(), "", "-:_2_2 -:_2_1", "VV, VH", "s2c"},
        // Quad layouts always present four channels.
        {Of<RUZ2GrpC4R>(), "HH HV VV", "HH:_1_1 HV:_2_2 -:_3_3 VV:_4_4", "HH, HV, VH, VV", "c4r"},
        {Of<RUZ2GeocC4R>(), "VV VH HV HH", "HH:_1_1 HV:_2_2 VH:_3_3 VV:_4_4", "HH, HV, VH, VV", "c4r"},
        {Of<ZirOdi2SLCS4C>(), "HH HV VH VV", "HH:_1_1 HV:_1_2 VH:_2_1 VV:_2_2", "HH, HV, VH, VV", "s4c"},
    };
    // clang-format on
    for (const Case &c : cases) {
        SCOPED_TRACE(std::string(c.matrixType) + " with \"" + c.bands + "\"");
        std::unique_ptr<ZirOdi2CalibImage> model = c.make();
        for (const std::string &band : Words(c.bands))
            model->AddBand(Code(band), "image.tif");
        const std::vector<std::string> channels = Words(c.channels);
        const int32_t kind =
            static_cast<int32_t>(c.matrixType[0] == 's' ? SampleKind::Complex
                                                        : SampleKind::Detected);
        ASSERT_EQ(model->ChannelCount(), int32_t(channels.size()));
        for (size_t i = 0; i < channels.size(); ++i) {
            SCOPED_TRACE("channel " + std::to_string(i + 1));
            const ChannelRecord *channel = model->FindChannel(int32_t(i + 1));
            ASSERT_NE(channel, nullptr);
            const size_t colon = channels[i].find(':');
            const int32_t code = Code(channels[i].substr(0, colon));
            EXPECT_EQ(channel->band,
                      code < 0 ? nullptr : model->FindBand(code));
            EXPECT_EQ(std::string(channel->description),
                      "Matrix_Element: " + channels[i].substr(colon + 1));
            EXPECT_EQ(channel->kind, kind);
            EXPECT_EQ(channel->bandChannel, 1);
        }
        EXPECT_EQ(TakeText(model->PolarizationText()), c.polarizationText);
        EXPECT_EQ(TakeText(model->MatrixType()), c.matrixType);
    }
}

// A plane of width x height samples whose value tells its row and column.
std::vector<float> Plane(int width, int height) {
    std::vector<float> plane;
    for (int r = 0; r < height; ++r)
        for (int c = 0; c < width; ++c)
            plane.push_back(static_cast<float>(1 + c + 7 * r));
    return plane;
}

TEST(ProductVariants, calibration_uses_the_gain_of_the_product_column) {
    const int kWidth = 5, kHeight = 3;
    struct Case {
        const char *name;
        Factory make;
        int columns; // of the table; gain 100 + 2 * column
        int32_t xOffset;
        float offset;
        bool complex = false; // divides the amplitude, without the offset
    } cases[] = {
        {"ground range at column 100", Of<RUZ2GrpC2R>(), 103, 100, 0.0f},
        {"geocoded at column 0 with offset", Of<RUZ2GeocCR>(), 103, 0, 12.5f},
        // The window reaches beyond the table: those columns take gain 1.
        {"ground range past the table", Of<RUZ2GrpcCR>(), 103, 100, 3.0f},
        {"before the first column", Of<RUZ2GrpcCR>(), 103, -2, 0.0f},
        {"without a table", Of<RUZ2GrpcCR>(), 0, 0, 0.0f},
        {"complex past the table", Of<ZirOdi2SLCS2C>(), 103, 100, 1000.0f,
         true},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.name);
        std::unique_ptr<ZirOdi2CalibImage> model = c.make();
        model->ResizeCalibrationTable(size_t(c.columns));
        for (int i = 0; i < c.columns; ++i)
            model->SetCalibrationValue(size_t(i), 100.0f + 2.0f * i);
        model->SetCalibrationOffset(c.offset);
        std::vector<float> samples = Plane(kWidth, kHeight);
        // The row offset plays no part.
        model->CalibrateDetected(c.xOffset, 977, kWidth, kHeight,
                                 samples.data());
        const std::vector<float> original = Plane(kWidth, kHeight);
        for (size_t k = 0; k < samples.size(); ++k) {
            const int column = c.xOffset + int(k % kWidth);
            const float gain = column >= 0 && column < c.columns
                                   ? 100.0f + 2.0f * column
                                   : 1.0f;
            const float s = original[k];
            const float expected =
                c.complex ? s / gain : (s * s + c.offset) / gain;
            EXPECT_NEAR(samples[k], expected, 1e-6f * std::fabs(expected))
                << "sample " << k;
        }
    }
    // Nothing to do, and nothing written.
    RUZ2GrpcCR model;
    model.CalibrateDetected(0, 0, 4, 2, nullptr);
    std::vector<float> untouched = Plane(4, 2);
    model.CalibrateDetected(0, 0, 0, 2, untouched.data());
    model.CalibrateDetected(0, 0, -4, 2, untouched.data());
    EXPECT_EQ(untouched, Plane(4, 2));
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
