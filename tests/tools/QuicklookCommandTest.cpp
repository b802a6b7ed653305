#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TiffWriter.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>
#include <png.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

using rs2test::CommandResult;
using rs2test::Quoted;

// Runs `rs2 quicklook` with the arguments through the shell, after the
// shell commands in `before` (limits).
CommandResult Quicklook(const std::string &arguments,
                        const std::string &before = "") {
    return rs2test::RunShell(before + Quoted(RS2_TOOL) + " quicklook " +
                             arguments);
}

// A PNG as libpng reads it back, in its own sample layout.
struct Png {
    uint32_t width = 0, height = 0;
    uint32_t channels = 0; // 1 grey, 3 RGB
    std::vector<uint8_t> samples;
    uint8_t At(uint32_t x, uint32_t y, uint32_t c = 0) const {
        return samples[(size_t(y) * width + x) * channels + c];
    }
};

Png ReadPng(const std::string &path) {
    png_image image{};
    image.version = PNG_IMAGE_VERSION;
    if (!png_image_begin_read_from_file(&image, path.c_str()))
        return {};
    Png png;
    png.width = image.width;
    png.height = image.height;
    png.channels = PNG_IMAGE_SAMPLE_CHANNELS(image.format);
    png.samples.resize(PNG_IMAGE_SIZE(image));
    if (!png_image_finish_read(&image, nullptr, png.samples.data(), 0,
                               nullptr)) {
        png_image_free(&image);
        return {};
    }
    return png;
}

// A generated product, and a folder for the previews of it.
struct Product {
    Product(const std::string &type, std::vector<std::string> polarizations,
            int width, int height) {
        options.productType = type;
        options.polarizations = std::move(polarizations);
        options.width = width;
        options.height = height;
        options.lutOffset = 2.5f;
        xml = rs2gen::GenerateProduct(folder.Path(), options).productXml;
    }
    rs2test::TempDir folder;
    rs2test::TempDir out;
    rs2gen::ProductOptions options;
    std::string xml;
};

size_t EntryCount(const std::string &folder) {
    return static_cast<size_t>(std::distance(fs::directory_iterator(folder),
                                             fs::directory_iterator()));
}

// The documented stretch, from power worked out independently: the 2nd and
// 98th percentiles (rank round(p / 100 * (n - 1)) of the sorted finite dB
// values) map to 0 and 255, linearly in dB; no data is 0.
std::vector<double> ExpectedLevels(const std::vector<double> &power) {
    std::vector<double> decibels, finite;
    for (double p : power) {
        decibels.push_back(p > 0.0 ? 10.0 * std::log10(p) : NAN);
        if (p > 0.0)
            finite.push_back(decibels.back());
    }
    std::sort(finite.begin(), finite.end());
    const auto rank = [&](double percentile) {
        return finite[size_t(
            std::lround(percentile / 100.0 * double(finite.size() - 1)))];
    };
    const double low = rank(2.0), high = rank(98.0);
    std::vector<double> levels;
    for (double d : decibels)
        levels.push_back(
            std::isnan(d)
                ? 0.0
                : std::clamp(std::round(255.0 * (d - low) / (high - low)), 0.0,
                             255.0));
    return levels;
}

} // namespace

TEST(QuicklookCommand, fits_the_preview_into_max_size_keeping_the_aspect) {
    const struct {
        int width, height, maxSize;
        uint32_t expectedWidth, expectedHeight;
    } cases[] = {
        {60, 40, 20, 20, 13},   // 13.33 rounds down
        {40, 60, 1024, 40, 60}, // never enlarged
        {30, 90, 9, 3, 9},      // the longer side is the limit
        {300, 1, 10, 10, 1},    // at least one row
    };
    for (const auto &c : cases) {
        const Product product("SGF", {"HH"}, c.width, c.height);
        const std::string png = product.out.File("q.png");
        const CommandResult result =
            Quicklook(Quoted(product.xml) + " " + Quoted(png) + " --max-size " +
                      std::to_string(c.maxSize));
        ASSERT_EQ(result.exitCode, 0) << c.width << " x " << c.height;
        const Png read = ReadPng(png);
        EXPECT_EQ(read.width, c.expectedWidth) << c.width << " x " << c.height;
        EXPECT_EQ(read.height, c.expectedHeight)
            << c.width << " x " << c.height;
    }
}

TEST(QuicklookCommand, shows_grey_or_the_datasets_colour_composite) {
    const Product single("SGF", {"HH"}, 24, 16);
    const Product dual("SGF", {"HH", "HV"}, 24, 16);
    const Product quad("SLC", {"HH", "HV", "VH", "VV"}, 24, 16);
    const struct {
        const Product *product;
        std::string options;
        uint32_t channels;
        std::string shown;
    } cases[] = {
        {&single, "", 1, "grey from channel 1,"},
        {&dual, "", 3, "RGB from channels 1, 2, 1,"},
        {&dual, "--channel 2", 1, "grey from channel 2,"},
        {&quad, "--calibration sigma", 3, "RGB from channels 1, 2, 4,"},
    };
    for (const auto &c : cases) {
        const std::string png = c.product->out.File("q.png");
        const CommandResult result = Quicklook(Quoted(c.product->xml) + " " +
                                               Quoted(png) + " " + c.options);
        ASSERT_EQ(result.exitCode, 0) << c.shown;
        EXPECT_NE(result.output.find(c.shown), std::string::npos)
            << result.output;
        const Png read = ReadPng(png);
        ASSERT_EQ(read.channels, c.channels) << c.shown;
        if (c.channels == 3) {
            // Red and blue show the same channel only where the dataset
            // says so (HH twice for a dual product).
            bool redIsBlue = true;
            for (uint32_t y = 0; y < read.height; ++y)
                for (uint32_t x = 0; x < read.width; ++x)
                    redIsBlue &= read.At(x, y, 0) == read.At(x, y, 2);
            EXPECT_EQ(redIsBlue, c.product == &dual) << c.shown;
        }
    }
}

TEST(QuicklookCommand, stretches_the_power_in_decibels_between_percentiles) {
    const Product sgf("SGF", {"HH"}, 60, 45);
    const Product slc("SLC", {"HH"}, 60, 45);
    using Power = std::function<double(const Product &, int x, int y)>;
    const auto dn = [](const Product &p, int x, int y) {
        return double(rs2gen::DetectedSample(p.options, 0, x, y));
    };
    const auto iq = [](const Product &p, int x, int y) {
        const auto [i, q] = rs2gen::ComplexSample(p.options, 0, x, y);
        return double(i) * i + double(q) * q;
    };
    const struct {
        const Product *product;
        std::string calibration;
        Power power;
    } cases[] = {
        {&sgf, "",
         [&](const Product &p, int x, int y) {
             return dn(p, x, y) * dn(p, x, y); // amplitude squared
         }},
        {&sgf, "sigma",
         [&](const Product &p, int x, int y) {
             const double gain =
                 rs2gen::LookupTableGains(p.options, "Sigma Nought")[x];
             const double offset =
                 rs2gen::LookupTableOffset(p.options, "Sigma Nought");
             return (dn(p, x, y) * dn(p, x, y) + offset) / gain;
         }},
        {&slc, "", iq},
        {&slc, "beta",
         [&](const Product &p, int x, int y) {
             const double gain =
                 rs2gen::LookupTableGains(p.options, "Beta Nought")[x];
             return iq(p, x, y) / (gain * gain);
         }},
    };
    for (const auto &c : cases) {
        const std::string png = c.product->out.File("q.png");
        const std::string calibration =
            c.calibration.empty() ? "" : " --calibration " + c.calibration;
        // 60 x 45 to 20 x 15: preview pixel (x, y) shows pixel (3x, 3y).
        ASSERT_EQ(Quicklook(Quoted(c.product->xml) + " " + Quoted(png) +
                            " --max-size 20" + calibration)
                      .exitCode,
                  0);
        const Png read = ReadPng(png);
        ASSERT_EQ(read.width * read.height, 300u);
        std::vector<double> power;
        for (int y = 0; y < 15; ++y)
            for (int x = 0; x < 20; ++x)
                power.push_back(c.power(*c.product, 3 * x, 3 * y));
        const std::vector<double> expected = ExpectedLevels(power);
        for (size_t i = 0; i < expected.size(); ++i)
            ASSERT_NEAR(read.samples[i], expected[i], 1.0)
                << c.product->options.productType << " " << c.calibration
                << " pixel " << i % 20 << ", " << i / 20;
    }
}

TEST(QuicklookCommand, shows_a_constant_image_mid_grey_and_no_data_black) {
    const rs2test::TempDir folder;
    const std::string tiff = folder.File("power.tif");
    rs2test::TiffShape shape;
    shape.width = 8;
    shape.height = 4;
    shape.bitsPerSample = 32;
    shape.sampleFormat = SAMPLEFORMAT_IEEEFP; // float: power as it is
    // Power 2.0 everywhere but column 0: zero, and negative on row 1.
    rs2test::WriteTiff(tiff, shape, [](uint32_t x, uint32_t y, uint32_t) {
        return x > 0 ? 2.0 : y == 1 ? -1.0 : 0.0;
    });
    const std::string png = folder.File("q.png");
    ASSERT_EQ(Quicklook(Quoted(tiff) + " " + Quoted(png)).exitCode, 0);
    const Png read = ReadPng(png);
    ASSERT_EQ(read.channels, 1u);
    for (uint32_t y = 0; y < 4; ++y)
        for (uint32_t x = 0; x < 8; ++x)
            EXPECT_EQ(read.At(x, y), x > 0 ? 128 : 0) << x << ", " << y;
}

TEST(QuicklookCommand, refuses_bad_options_with_exit_2_and_writes_nothing) {
    const Product dual("SGF", {"HH", "HV"}, 24, 16);
    const std::string out = Quoted(dual.out.File("q.png"));
    const std::string options[] = {"--max-size 0", "--max-size -4",
                                   "--channel 0", "--channel 3",
                                   "--calibration kelvin"};
    for (const std::string &option : options)
        EXPECT_EQ(
            Quicklook(Quoted(dual.xml) + " " + out + " " + option).exitCode, 2)
            << option;
    // A name that chooses a calibration takes no second choice.
    EXPECT_EQ(Quicklook(Quoted(dual.xml + "?c=sigma") + " " + out +
                        " --calibration beta")
                  .exitCode,
              2);
    EXPECT_EQ(EntryCount(dual.out.Path()), 0u);
}

TEST(QuicklookCommand, fails_with_exit_1_and_leaves_no_partial_file) {
    const Product product("SGF", {"HH", "HV"}, 200, 150);
    // A folder that does not exist.
    EXPECT_EQ(Quicklook(Quoted(product.xml) + " " +
                        Quoted(product.out.File("missing/q.png")))
                  .exitCode,
              1);
    // A file size limit far below the PNG (an RGB preview of speckle): the
    // write fails part-way, and the file already there stays as it was.
    const std::string png = product.out.File("q.png");
    std::ofstream(png) << "old";
    EXPECT_EQ(Quicklook(Quoted(product.xml) + " " + Quoted(png),
                        "ulimit -f 8; trap '' XFSZ; ")
                  .exitCode,
              1);
    EXPECT_EQ(EntryCount(product.out.Path()), 1u);
    std::ifstream kept(png);
    std::string text;
    kept >> text;
    EXPECT_EQ(text, "old");
    // An image the product names is missing: its channel would be black.
    fs::remove(fs::path(product.folder.Path()) / "imagery_HV.tif");
    const CommandResult missing = Quicklook(Quoted(product.xml) + " " +
                                            Quoted(product.out.File("m.png")));
    EXPECT_EQ(missing.exitCode, 1);
    EXPECT_NE(missing.errors.find("imagery_HV.tif: no such file"),
              std::string::npos)
        << missing.errors;
    EXPECT_EQ(EntryCount(product.out.Path()), 1u);
}
