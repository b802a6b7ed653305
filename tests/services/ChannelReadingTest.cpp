#include "host/ErrorReports.hpp"
#include "model/ZirOdi2CalibImage.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TiffWriter.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <vector>

// A failed allocation must come back as null, also under the address
// sanitizer, so that the reads can report it.
extern "C" const char *__asan_default_options();
extern "C" const char *__asan_default_options() {
    return "allocator_may_return_null=1";
}

namespace {

// A product loaded the way the open operation loads it. The reader is
// declared first so that it outlives the model, which borrows from it.
struct LoadedProduct {
    LoadedProduct(const std::string &productXml, const char *option)
        : model(LoadProduct(reader, productXml.c_str(), option)) {}
    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model;
};

struct Window {
    int32_t x, y, width, height;       // in the image
    int32_t bufferWidth, bufferHeight; // of the output
    size_t Pixels() const {
        return static_cast<size_t>(bufferWidth) *
               static_cast<size_t>(bufferHeight);
    }
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
    std::vector<float> buffer(w.Pixels() * channels.size() *
                                  static_cast<size_t>(valuesPerSample),
                              kUntouched);
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

float Detected(const rs2gen::ProductOptions &options, int polarization, int x,
               int y) {
    return static_cast<float>(
        rs2gen::DetectedSample(options, polarization, x, y));
}

// Checks a complex read whose output (x, y) comes from image column
// sourceX(x) and line sourceY(y), divided by that column's gain.
template <typename SourceX, typename SourceY>
void ExpectComplexRead(const rs2gen::ProductOptions &options,
                       const std::vector<float> &gains,
                       const std::vector<float> &buffer, const Window &w,
                       SourceX sourceX, SourceY sourceY) {
    for (int y = 0; y < w.bufferHeight; ++y) {
        for (int x = 0; x < w.bufferWidth; ++x) {
            const int column = sourceX(x);
            const auto sample =
                rs2gen::ComplexSample(options, 0, column, sourceY(y));
            const float gain = static_cast<size_t>(column) < gains.size()
                                   ? gains[static_cast<size_t>(column)]
                                   : 1.0f;
            const size_t k = static_cast<size_t>(y) * w.bufferWidth + x;
            ASSERT_FLOAT_EQ(buffer[2 * k], sample.first / gain)
                << "in-phase at " << x << "," << y;
            ASSERT_FLOAT_EQ(buffer[2 * k + 1], sample.second / gain)
                << "quadrature at " << x << "," << y;
        }
    }
}

TEST(ChannelReading,
     real_read_of_uncalibrated_detected_product_returns_image_values) {
    rs2test::TempDir dir;
    const auto options = Options("SGF", {"HH"}, 64, 48);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, nullptr);
    ASSERT_NE(loaded.model, nullptr);
    ASSERT_STREQ(loaded.model->GetCalibrationType(), "None");

    const Window w{5, 7, 20, 10, 20, 10};
    const auto buffer = ReadReal(*loaded.model, w, {1});
    for (int y = 0; y < w.height; ++y)
        for (int x = 0; x < w.width; ++x)
            ASSERT_EQ(buffer[static_cast<size_t>(y) * w.width + x],
                      Detected(options, 0, w.x + x, w.y + y))
                << x << "," << y;
}

TEST(ChannelReading,
     calibrated_detected_read_takes_gain_and_offset_of_image_column) {
    rs2test::TempDir dir;
    auto options = Options("SGF", {"HH"}, 160, 20);
    options.lutOffset = 2.5f;
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "sigma");
    ASSERT_NE(loaded.model, nullptr);
    ASSERT_STREQ(loaded.model->GetCalibrationType(), "Sigma Nought");
    const auto gains = rs2gen::LookupTableGains(options, "Sigma Nought");
    const float offset = rs2gen::LookupTableOffset(options, "Sigma Nought");
    ASSERT_NE(gains[100], gains[0]); // the column must matter

    const Window w{100, 3, 40, 8, 40, 8};
    const auto buffer = ReadReal(*loaded.model, w, {1});
    for (int y = 0; y < w.height; ++y) {
        for (int x = 0; x < w.width; ++x) {
            const float dn = Detected(options, 0, w.x + x, w.y + y);
            const float expected = (dn * dn + offset) / gains[w.x + x];
            EXPECT_NEAR(buffer[static_cast<size_t>(y) * w.width + x], expected,
                        1e-6f * expected)
                << x << "," << y;
        }
    }
}

TEST(ChannelReading, detected_real_read_serves_listed_channels_in_list_order) {
    rs2test::TempDir dir;
    // HH and HV: channel 1 reads HH (index 0), channel 2 HV (index 1).
    const auto options = Options("SGF", {"HH", "HV"}, 24, 16);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "none");
    ASSERT_NE(loaded.model, nullptr);

    // Channel 2 twice, a channel the dataset does not define, channel 1.
    const std::vector<int32_t> channels = {2, 9, 1, 2};
    const Window w{3, 2, 8, 6, 8, 6};
    const auto buffer = ReadReal(*loaded.model, w, channels);
    for (int y = 0; y < w.height; ++y) {
        for (int x = 0; x < w.width; ++x) {
            const size_t p = static_cast<size_t>(y) * w.width + x;
            const float hv = Detected(options, 1, w.x + x, w.y + y);
            ASSERT_EQ(buffer[4 * p + 0], hv);
            ASSERT_EQ(buffer[4 * p + 1], 0.0f);
            ASSERT_EQ(buffer[4 * p + 2],
                      Detected(options, 0, w.x + x, w.y + y));
            ASSERT_EQ(buffer[4 * p + 3], hv);
        }
    }
}

TEST(ChannelReading, detected_channel_without_image_file_reads_zero) {
    rs2test::TempDir dir;
    // HH and VH only: the layout pairs VV (no image) with VH.
    const auto options = Options("SGF", {"HH", "VH"}, 24, 16);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "sigma");
    ASSERT_NE(loaded.model, nullptr);
    loaded.model->EnsureChannels();
    const ChannelRecord *vv = loaded.model->FindChannel(1);
    ASSERT_NE(vv, nullptr);
    ASSERT_EQ(vv->band, nullptr);
    const auto gains = rs2gen::LookupTableGains(options, "Sigma Nought");

    // The host halves the window: output column x is image column 2x.
    const Window w{0, 0, 24, 16, 12, 8};
    const auto buffer = ReadReal(*loaded.model, w, {1, 2});
    for (int y = 0; y < w.bufferHeight; ++y) {
        for (int x = 0; x < w.bufferWidth; ++x) {
            const size_t p = static_cast<size_t>(y) * w.bufferWidth + x;
            const float vh = Detected(options, 1, 2 * x, 2 * y);
            ASSERT_EQ(buffer[2 * p], 0.0f) << p;
            // Calibrated with the gain of the image column it came from.
            const float expected = vh * vh / gains[2 * x];
            EXPECT_NEAR(buffer[2 * p + 1], expected, 1e-6f * expected) << p;
        }
    }
}

TEST(ChannelReading, integer_read_of_detected_product_lets_host_resample) {
    rs2test::TempDir dir;
    const auto options = Options("SGX", {"HH"}, 48, 40);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, nullptr);
    ASSERT_NE(loaded.model, nullptr);

    // Half the window in each direction: image column 4 + 2k, line 2 + 2j.
    const Window w{4, 2, 30, 20, 15, 10};
    const auto buffer = ReadInteger(*loaded.model, w, {1, 4});
    for (int y = 0; y < w.bufferHeight; ++y) {
        for (int x = 0; x < w.bufferWidth; ++x) {
            const size_t p = static_cast<size_t>(y) * w.bufferWidth + x;
            ASSERT_EQ(buffer[2 * p], rs2gen::DetectedSample(
                                         options, 0, w.x + 2 * x, w.y + 2 * y));
            // Channel 4 does not exist: its samples stay as they were.
            ASSERT_EQ(buffer[2 * p + 1], kUntouchedWord);
        }
    }
}

TEST(ChannelReading,
     integer_read_of_calibrated_product_leaves_buffer_as_it_was) {
    rs2test::TempDir dir;
    const auto options = Options("SGF", {"HH"}, 16, 12);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "beta");
    ASSERT_NE(loaded.model, nullptr);
    ASSERT_STREQ(loaded.model->GetCalibrationType(), "Beta Nought");

    const auto buffer = ReadInteger(*loaded.model, {0, 0, 16, 12, 16, 12}, {1});
    for (int32_t word : buffer)
        ASSERT_EQ(word, kUntouchedWord);
}

TEST(ChannelReading, requests_without_output_write_nothing) {
    rs2test::TempDir dir;
    const auto options = Options("SGF", {"HH"}, 16, 12);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, nullptr);
    ASSERT_NE(loaded.model, nullptr);

    struct Case {
        const char *what;
        int32_t bufferWidth, bufferHeight, channelCount;
    };
    const Case cases[] = {
        {"no channels", 4, 4, 0},
        {"negative channel count", 4, 4, -1},
        {"empty buffer width", 0, 4, 1},
        {"negative buffer height", 4, -2, 1},
    };
    const int32_t channels[] = {1};
    for (const Case &c : cases) {
        std::vector<float> real(16, kUntouched);
        std::vector<int32_t> words(16, kUntouchedWord);
        loaded.model->ReadRealChannels(0, 0, 0, 4, 4, real.data(),
                                       c.bufferWidth, c.bufferHeight,
                                       c.channelCount, channels);
        loaded.model->ReadIntegerChannels(0, 0, 0, 4, 4, words.data(),
                                          c.bufferWidth, c.bufferHeight,
                                          c.channelCount, channels);
        for (float value : real)
            EXPECT_EQ(value, kUntouched) << c.what;
        for (int32_t word : words)
            EXPECT_EQ(word, kUntouchedWord) << c.what;
    }
}

TEST(ChannelReading,
     integer_read_of_slc_packs_in_phase_low_and_quadrature_high) {
    rs2test::TempDir dir;
    auto options = Options("SLC", {"HH"}, 2, 2);
    options.tiePoints = false;
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);

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
    // The generator's image replaced by one holding the cases, pixel by pixel.
    rs2test::TiffSpec layout;
    layout.width = 2;
    layout.height = 2;
    layout.samplesPerPixel = 2;
    layout.sampleFormat = SAMPLEFORMAT_INT;
    rs2test::WriteTiff(product.imageFiles.at(0), layout,
                       [&](uint32_t x, uint32_t y, uint32_t element) {
                           const Case &c = cases[y * 2 + x];
                           return element == 0 ? c.inPhase : c.quadrature;
                       });
    LoadedProduct loaded(product.productXml, nullptr);
    ASSERT_NE(loaded.model, nullptr);

    const auto buffer = ReadInteger(*loaded.model, {0, 0, 2, 2, 2, 2}, {1});
    for (size_t p = 0; p < 4; ++p)
        EXPECT_EQ(static_cast<uint32_t>(buffer[p]), cases[p].word)
            << cases[p].inPhase << "," << cases[p].quadrature;
}

TEST(ChannelReading, complex_read_of_uncalibrated_slc_returns_raw_pairs) {
    rs2test::TempDir dir;
    const auto options = Options("SLC", {"HH"}, 32, 24);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "none");
    ASSERT_NE(loaded.model, nullptr);

    const Window w{2, 3, 10, 6, 10, 6};
    const auto buffer = ReadReal(*loaded.model, w, {1}, 2);
    ExpectComplexRead(
        options, {}, buffer, w, [&](int x) { return w.x + x; },
        [&](int y) { return w.y + y; });
}

TEST(ChannelReading,
     complex_read_at_half_size_takes_every_second_column_and_its_gain) {
    rs2test::TempDir dir;
    const auto options = Options("SLC", {"HH"}, 64, 32);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "sigma");
    ASSERT_NE(loaded.model, nullptr);
    const auto gains = rs2gen::LookupTableGains(options, "Sigma Nought");

    const Window w{3, 2, 20, 10, 10, 5};
    const auto buffer = ReadReal(*loaded.model, w, {1}, 2);
    ExpectComplexRead(
        options, gains, buffer, w, [&](int x) { return w.x + 2 * x; },
        [&](int y) { return w.y + 2 * y; });
}

TEST(ChannelReading,
     complex_read_larger_than_window_repeats_pixels_up_to_last_ones) {
    rs2test::TempDir dir;
    const auto options = Options("SLC", {"HH"}, 40, 30);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "gamma");
    ASSERT_NE(loaded.model, nullptr);
    const auto gains = rs2gen::LookupTableGains(options, "Gamma");

    // 5 x 3 pixels spread over 12 x 7: the last output column and line hold
    // the window's last ones, never the image pixels beyond it.
    const Window w{10, 5, 5, 3, 12, 7};
    const auto buffer = ReadReal(*loaded.model, w, {1}, 2);
    const auto column = [&](int x) {
        return w.x + x * w.width / w.bufferWidth;
    };
    const auto line = [&](int y) {
        return w.y + y * w.height / w.bufferHeight;
    };
    ASSERT_EQ(column(w.bufferWidth - 1), w.x + w.width - 1);
    ASSERT_EQ(line(w.bufferHeight - 1), w.y + w.height - 1);
    ExpectComplexRead(options, gains, buffer, w, column, line);
}

TEST(ChannelReading, complex_read_of_large_window_matches_every_pixel) {
    rs2test::TempDir dir;
    // Wide enough that the window is read in several slices of rows.
    const auto options = Options("SLC", {"HH"}, 1024, 300);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "sigma");
    ASSERT_NE(loaded.model, nullptr);
    const auto gains = rs2gen::LookupTableGains(options, "Sigma Nought");

    const Window full{0, 0, 1024, 300, 1024, 300};
    ExpectComplexRead(
        options, gains, ReadReal(*loaded.model, full, {1}, 2), full,
        [](int x) { return x; }, [](int y) { return y; });

    // A preview at about 1/7: rows and columns picked by the float ratio.
    const Window preview{7, 11, 1001, 280, 150, 41};
    const float rx = 1001.0f / 150.0f;
    const float ry = 280.0f / 41.0f;
    ExpectComplexRead(
        options, gains, ReadReal(*loaded.model, preview, {1}, 2), preview,
        [&](int x) {
            return preview.x + std::min(static_cast<int>(x * rx), 1000);
        },
        [&](int y) {
            return preview.y + std::min(static_cast<int>(y * ry), 279);
        });
}

TEST(ChannelReading, complex_read_leaves_samples_of_undefined_channel) {
    rs2test::TempDir dir;
    const auto options = Options("SLC", {"HH"}, 16, 8);
    const auto product = rs2gen::GenerateProduct(dir.Path(), options);
    LoadedProduct loaded(product.productXml, "sigma");
    ASSERT_NE(loaded.model, nullptr);
    const auto gains = rs2gen::LookupTableGains(options, "Sigma Nought");

    const Window w{1, 1, 8, 4, 8, 4};
    const auto buffer = ReadReal(*loaded.model, w, {3, 1}, 2);
    for (int y = 0; y < w.height; ++y) {
        for (int x = 0; x < w.width; ++x) {
            const size_t k = 2 * (static_cast<size_t>(y) * w.width + x);
            const auto sample =
                rs2gen::ComplexSample(options, 0, w.x + x, w.y + y);
            ASSERT_EQ(buffer[2 * k], kUntouched);
            ASSERT_EQ(buffer[2 * k + 1], kUntouched);
            ASSERT_FLOAT_EQ(buffer[2 * k + 2], sample.first / gains[w.x + x]);
            ASSERT_FLOAT_EQ(buffer[2 * k + 3], sample.second / gains[w.x + x]);
        }
    }
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
        rs2test::TempDir dir;
        const auto product =
            rs2gen::GenerateProduct(dir.Path(), Options(c.type, {"HH"}, 8, 8));
        LoadedProduct loaded(product.productXml, nullptr);
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
