#include "host/ErrorReports.hpp"
#include "tests/support/LoadedProduct.hpp"
#include "tests/support/TiffWriter.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <string>
#include <vector>

// A failed allocation must come back as null, also under the address
// sanitizer, so that the reads can report it.
extern "C" const char *__asan_default_options();
extern "C" const char *__asan_default_options() {
    return "allocator_may_return_null=1";
}

namespace {

using rs2test::LoadedProduct;

struct Window {
    int32_t x, y, width, height;       // in the image
    int32_t bufferWidth, bufferHeight; // of the output
    size_t Pixels() const {
        return static_cast<size_t>(bufferWidth) *
               static_cast<size_t>(bufferHeight);
    }
    // The image column and line output (k, j) reads when the host resamples.
    int Column(int k) const { return x + k * width / bufferWidth; }
    int Line(int j) const { return y + j * height / bufferHeight; }
};

constexpr float kUntouched = -7.0f;
constexpr int32_t kUntouchedWord = 0x5A5A5A5A;

rs2gen::ProductOptions Options(const std::string &type,
                               std::vector<std::string> polarizations,
                               int width, int height) {
    rs2gen::ProductOptions options;
    options.productType = type;
    options.polarizations = std::move(polarizations);
    options.width = width;
    options.height = height;
    options.rationalFunctions = false;
    options.tieGridColumns = std::min(width, 4);
    options.tieGridRows = std::min(height, 4);
    return options;
}

std::vector<float> ReadReal(ZirOdi2CalibImage &model, const Window &w,
                            const std::vector<int32_t> &channels,
                            int valuesPerSample = 1) {
    std::vector<float> buffer(
        w.Pixels() * channels.size() * size_t(valuesPerSample), kUntouched);
    model.ReadRealChannels(
        0, w.x, w.y, w.width, w.height, buffer.data(), w.bufferWidth,
        w.bufferHeight, static_cast<int32_t>(channels.size()), channels.data());
    return buffer;
}

std::vector<int32_t> ReadInteger(ZirOdi2CalibImage &model, const Window &w,
                                 const std::vector<int32_t> &channels) {
    std::vector<int32_t> buffer(w.Pixels() * channels.size(), kUntouchedWord);
    model.ReadIntegerChannels(
        0, w.x, w.y, w.width, w.height, buffer.data(), w.bufferWidth,
        w.bufferHeight, static_cast<int32_t>(channels.size()), channels.data());
    return buffer;
}

TEST(ChannelReading, detected_real_reads_give_each_listed_channel_its_image) {
    struct Case {
        const char *what;
        rs2gen::ProductOptions options;
        const char *calibration; // the table kind; null: uncalibrated
        Window window;
        std::vector<int32_t> channels;
        std::vector<int> images; // generator image index per channel
    };
    rs2gen::ProductOptions withOffset = Options("SGF", {"HH"}, 160, 20);
    withOffset.lutOffset = 2.5f;
    // clang-format off
    const Case cases[] = {
        {"uncalibrated: the image values", Options("SGF", {"HH"}, 64, 48),
         nullptr, {5, 7, 20, 10, 20, 10}, {1}, {0}},
        // Columns 100 on: the gain of the image column, not the window's.
        {"calibrated: gain and offset of the image column", withOffset,
         "Sigma Nought", {100, 3, 40, 8, 40, 8}, {1}, {0}},
        // Channel 2 twice, then channel 1.
        {"channels in list order", Options("SGF", {"HH", "HV"}, 24, 16),
         nullptr, {3, 2, 8, 6, 8, 6}, {2, 1, 2}, {1, 0, 1}},
        // The host halves the window, and each column keeps its own gain.
        {"resampled", Options("SGF", {"HH", "HV"}, 24, 16),
         "Sigma Nought", {0, 0, 24, 16, 12, 8}, {2}, {1}},
        // HH and VH: channel 1 shows VV, which has no image, so VH's image
        // gives the dataset its size and stays readable.
        {"first channel without image", Options("SGF", {"HH", "VH"}, 24, 16),
         nullptr, {2, 3, 20, 12, 20, 12}, {2}, {1}},
    };
    // clang-format on
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        LoadedProduct loaded(c.options, c.calibration ? "sigma" : nullptr);
        ASSERT_NE(loaded.model, nullptr);
        EXPECT_STREQ(loaded.model->GetCalibrationType(),
                     c.calibration ? c.calibration : "None");
        const std::vector<float> gains =
            c.calibration ? rs2gen::LookupTableGains(c.options, c.calibration)
                          : std::vector<float>();
        const float offset =
            c.calibration ? rs2gen::LookupTableOffset(c.options, c.calibration)
                          : 0.0f;
        const Window &w = c.window;
        const std::vector<float> buffer =
            ReadReal(*loaded.model, w, c.channels);
        size_t i = 0, mismatches = 0;
        for (int y = 0; y < w.bufferHeight; ++y)
            for (int x = 0; x < w.bufferWidth; ++x)
                for (int image : c.images) {
                    const int column = w.Column(x);
                    const float dn = float(rs2gen::DetectedSample(
                        c.options, image, column, w.Line(y)));
                    const float expected =
                        c.calibration
                            ? (dn * dn + offset) / gains.at(size_t(column))
                            : dn;
                    mismatches += std::fabs(buffer[i++] - expected) >
                                  1e-6f * std::fabs(expected);
                }
        EXPECT_EQ(mismatches, 0u);
    }
}

TEST(ChannelReading, integer_read_of_detected_product_lets_host_resample) {
    const auto options = Options("SGX", {"HH"}, 48, 40);
    LoadedProduct loaded(options, nullptr);
    ASSERT_NE(loaded.model, nullptr);
    // Half the window in each direction: image column 4 + 2k, line 2 + 2j.
    const Window w{4, 2, 30, 20, 15, 10};
    const auto buffer = ReadInteger(*loaded.model, w, {1});
    for (int y = 0; y < w.bufferHeight; ++y) {
        for (int x = 0; x < w.bufferWidth; ++x) {
            const size_t p = static_cast<size_t>(y) * w.bufferWidth + x;
            ASSERT_EQ(buffer[p], rs2gen::DetectedSample(options, 0, w.x + 2 * x,
                                                        w.y + 2 * y));
        }
    }
}

// A read either fills the whole buffer or reports why it cannot, and then
// leaves the buffer as it was.
TEST(ChannelReading, requests_it_cannot_serve_are_errors_that_write_nothing) {
    struct Case {
        const char *what;
        const char *type;
        std::vector<std::string> polarizations;
        const char *calibration;
        bool integer;
        int32_t bufferWidth, bufferHeight;
        std::vector<int32_t> channels;
        const char *message;
    };
    // clang-format off
    const Case cases[] = {
        {"integer read of calibrated values", "SGF", {"HH"}, "beta", true, 4, 4, {1}, "calibrated to Beta Nought"},
        {"no channels", "SGF", {"HH"}, nullptr, false, 4, 4, {}, "is empty"},
        {"empty buffer", "SGF", {"HH"}, nullptr, true, 0, 4, {1}, "is empty"},
        {"undefined channel, detected", "SGF", {"HH"}, "sigma", false, 4, 4, {1, 4}, "has no channel 4"},
        {"undefined channel, integer", "SGF", {"HH"}, nullptr, true, 4, 4, {4}, "has no channel 4"},
        {"undefined channel, complex", "SLC", {"HH"}, "sigma", false, 4, 4, {1, 3}, "has no channel 3"},
        // HH and VH only: the layout pairs VV (no image) with VH.
        {"channel without image, detected", "SGF", {"HH", "VH"}, nullptr, false, 4, 4, {2, 1}, "channel 1: product.xml names no image"},
        {"channel without image, integer", "SGF", {"HH", "VH"}, nullptr, true, 4, 4, {1}, "no image file for it"},
    };
    // clang-format on
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        LoadedProduct loaded(Options(c.type, c.polarizations, 16, 12),
                             c.calibration);
        ASSERT_NE(loaded.model, nullptr);
        std::vector<float> real(32, kUntouched);
        std::vector<int32_t> words(32, kUntouchedWord);
        const auto count = static_cast<int32_t>(c.channels.size());
        try {
            if (c.integer)
                loaded.model->ReadIntegerChannels(0, 0, 0, 4, 4, words.data(),
                                                  c.bufferWidth, c.bufferHeight,
                                                  count, c.channels.data());
            else
                loaded.model->ReadRealChannels(0, 0, 0, 4, 4, real.data(),
                                               c.bufferWidth, c.bufferHeight,
                                               count, c.channels.data());
            ADD_FAILURE() << "no error reported";
        } catch (const host::ReportedError &error) {
            EXPECT_NE(std::string(error.what()).find(c.message),
                      std::string::npos)
                << error.what();
        }
        EXPECT_EQ(real, std::vector<float>(32, kUntouched));
        EXPECT_EQ(words, std::vector<int32_t>(32, kUntouchedWord));
    }
}

TEST(ChannelReading,
     integer_read_of_slc_packs_in_phase_low_and_quadrature_high) {
    struct Case {
        int16_t inPhase, quadrature;
        uint32_t word;
    };
    const Case cases[4] = {
        {-2, 3, 0x0003FFFEu},
        {32767, -32768, 0x80007FFFu},
        {-1, 0, 0x0000FFFFu},
        {0, -1, 0xFFFF0000u},
    };
    auto options = Options("SLC", {"HH"}, 2, 2);
    options.tiePoints = false;
    // The generator's image replaced by one holding the cases, pixel by pixel.
    LoadedProduct loaded(options, nullptr, [&](const auto &product) {
        rs2test::TiffShape layout;
        layout.width = 2;
        layout.height = 2;
        layout.samplesPerPixel = 2;
        layout.sampleFormat = SAMPLEFORMAT_INT;
        rs2test::WriteTiff(product.imageFiles.at(0), layout,
                           [&](uint32_t x, uint32_t y, uint32_t element) {
                               const Case &c = cases[y * 2 + x];
                               return element == 0 ? c.inPhase : c.quadrature;
                           });
    });
    ASSERT_NE(loaded.model, nullptr);
    const auto buffer = ReadInteger(*loaded.model, {0, 0, 2, 2, 2, 2}, {1});
    for (size_t p = 0; p < 4; ++p)
        EXPECT_EQ(static_cast<uint32_t>(buffer[p]), cases[p].word)
            << cases[p].inPhase << "," << cases[p].quadrature;
}

// Checks a complex read of channels (only 1 is defined: the others keep
// their samples) whose output (x, y) comes from image column sourceX(x) and
// line sourceY(y), divided by that column's gain.
void ExpectComplexRead(const rs2gen::ProductOptions &options,
                       const std::vector<float> &gains,
                       const std::vector<float> &buffer, const Window &w,
                       const std::vector<int32_t> &channels,
                       const std::function<int(int)> &sourceX,
                       const std::function<int(int)> &sourceY) {
    size_t k = 0;
    for (int y = 0; y < w.bufferHeight; ++y) {
        for (int x = 0; x < w.bufferWidth; ++x) {
            const int column = sourceX(x);
            const auto sample =
                rs2gen::ComplexSample(options, 0, column, sourceY(y));
            const float gain =
                size_t(column) < gains.size() ? gains[size_t(column)] : 1.0f;
            for (int32_t channel : channels) {
                const bool defined = channel == 1;
                ASSERT_FLOAT_EQ(buffer[k++],
                                defined ? sample.first / gain : kUntouched)
                    << "in-phase at " << x << "," << y;
                ASSERT_FLOAT_EQ(buffer[k++],
                                defined ? sample.second / gain : kUntouched)
                    << "quadrature at " << x << "," << y;
            }
        }
    }
}

TEST(ChannelReading, complex_reads_give_pairs_divided_by_the_column_gain) {
    struct Case {
        const char *what;
        int width, height;
        const char *option, *kind; // kind: of the table, null for none
        Window window;
        std::vector<int32_t> channels;
    };
    // clang-format off
    const Case cases[] = {
        {"uncalibrated: the raw pairs", 32, 24, "none", nullptr, {2, 3, 10, 6, 10, 6}, {1}},
        {"half size: every second column and its gain", 64, 32, "sigma", "Sigma Nought", {3, 2, 20, 10, 10, 5}, {1}},
        // 5 x 3 pixels spread over 12 x 7: the last output column and line
        // hold the window's last ones, never the image pixels beyond it.
        {"larger than the window", 40, 30, "gamma", "Gamma", {10, 5, 5, 3, 12, 7}, {1}},
    };
    // clang-format on
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        const auto options = Options("SLC", {"HH"}, c.width, c.height);
        LoadedProduct loaded(options, c.option);
        ASSERT_NE(loaded.model, nullptr);
        const Window &w = c.window;
        ExpectComplexRead(
            options,
            c.kind ? rs2gen::LookupTableGains(options, c.kind)
                   : std::vector<float>(),
            ReadReal(*loaded.model, w, c.channels, 2), w, c.channels,
            [&](int x) { return w.Column(x); },
            [&](int y) { return w.Line(y); });
    }
}

TEST(ChannelReading, complex_read_of_large_window_matches_every_pixel) {
    // Wide enough that the window is read in several slices of rows.
    const auto options = Options("SLC", {"HH"}, 1024, 300);
    LoadedProduct loaded(options, "sigma");
    ASSERT_NE(loaded.model, nullptr);
    const auto gains = rs2gen::LookupTableGains(options, "Sigma Nought");

    const Window full{0, 0, 1024, 300, 1024, 300};
    ExpectComplexRead(
        options, gains, ReadReal(*loaded.model, full, {1}, 2), full, {1},
        [](int x) { return x; }, [](int y) { return y; });

    // A preview at about 1/7: rows and columns picked by the float ratio.
    const Window preview{7, 11, 1001, 280, 150, 41};
    const float rx = 1001.0f / 150.0f;
    const float ry = 280.0f / 41.0f;
    ExpectComplexRead(
        options, gains, ReadReal(*loaded.model, preview, {1}, 2), preview, {1},
        [&](int x) { return 7 + std::min(static_cast<int>(x * rx), 1000); },
        [&](int y) { return 11 + std::min(static_cast<int>(y * ry), 279); });
}

TEST(ChannelReading, scratch_memory_that_cannot_be_had_is_a_reported_error) {
    enum class Read { Integer, Real };
    constexpr int32_t kHuge = std::numeric_limits<int32_t>::max();
    constexpr int32_t kVast = int32_t{1} << 24; // 2^48 pixels: no allocator
    struct Case {
        const char *type;
        Read read;
        int32_t bufferSize; // width and height of the output
    } cases[] = {
        // A size the allocator cannot even be asked for.
        {"SGF", Read::Integer, kHuge},
        {"SLC", Read::Integer, kHuge},
        {"SGF", Read::Real, kHuge},
        // A size the allocator refuses.
        {"SGF", Read::Integer, kVast},
        {"SLC", Read::Integer, kVast},
        {"SGF", Read::Real, kVast},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(std::string(c.type) + " " + std::to_string(c.bufferSize));
        LoadedProduct loaded(Options(c.type, {"HH"}, 8, 8), nullptr);
        ASSERT_NE(loaded.model, nullptr);

        // The output buffer is a guard: the read must fail before using it.
        std::vector<int32_t> words(16, kUntouchedWord);
        std::vector<float> floats(16, kUntouched);
        const int32_t channels[] = {1};
        try {
            if (c.read == Read::Integer)
                loaded.model->ReadIntegerChannels(0, 0, 0, 4, 4, words.data(),
                                                  c.bufferSize, c.bufferSize, 1,
                                                  channels);
            else
                loaded.model->ReadRealChannels(0, 0, 0, 4, 4, floats.data(),
                                               c.bufferSize, c.bufferSize, 1,
                                               channels);
            ADD_FAILURE() << "the read reported nothing";
        } catch (const host::ReportedError &error) {
            EXPECT_EQ(error.code, 12);
            EXPECT_EQ(error.reportClass, host::kError);
            EXPECT_EQ(std::string(error.what()),
                      std::string("out of memory reading ") +
                          loaded.model->GetProductDirectory());
        }
        EXPECT_EQ(words, std::vector<int32_t>(16, kUntouchedWord));
        EXPECT_EQ(floats, std::vector<float>(16, kUntouched));
    }
}

} // namespace
