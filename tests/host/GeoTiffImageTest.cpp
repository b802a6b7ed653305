#include "host/GeoTiffImage.hpp"
#include "host/BlockMemoryBudget.hpp"
#include "host/ErrorReports.hpp"
#include "host/ModelSegments.hpp"
#include "host/Raster.hpp"
#include "host/RasterServices.hpp"
#include "host/TiffFile.hpp"
#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"
#include "tests/support/TiffWriter.hpp"

#include <gtest/gtest.h>
#include <tiffio.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <limits>
#include <memory>
#include <sstream>
#include <string>
#include <type_traits>
#include <vector>

namespace {

using host::GeoTiffImage;
using host::ReportedError;
using host::WindowRequest;
using rs2test::TempDir;
using rs2test::TiffShape;

constexpr uint32_t kWidth = 37;  // not a multiple of the 16-pixel tiles
constexpr uint32_t kHeight = 29; // nor of the strip heights used

struct FormatCase {
    const char *name;
    uint16_t bitsPerSample;
    uint16_t sampleFormat;
    // Element values, exact in the format: a pattern that differs between
    // neighbours, lines and elements, spread over the format's full range
    // (signs included) as (pattern * spread % range) * step - shift.
    uint64_t spread, range;
    double step, shift;
    int32_t channelType;
    int32_t channelsPerSample;

    double Value(uint32_t x, uint32_t y, uint32_t element) const {
        const uint64_t pattern =
            uint64_t(x) * 37 + uint64_t(y) * 101 + uint64_t(element) * 53;
        return double(pattern * spread % range) * step - shift;
    }
    rs2test::ElementValue Values() const {
        return [this](uint32_t x, uint32_t y, uint32_t e) {
            return Value(x, y, e);
        };
    }
};

constexpr uint64_t k2To32 = 4294967296u;

// clang-format off
const FormatCase kFormats[] = {
    {"uint8", 8, SAMPLEFORMAT_UINT, 1, 256, 1, 0, kChanUInt8, 1},
    {"int8", 8, SAMPLEFORMAT_INT, 1, 256, 1, 128, kChanInt16, 1},
    {"uint16", 16, SAMPLEFORMAT_UINT, 97, 65536, 1, 0, kChanUInt16, 1},
    {"int16", 16, SAMPLEFORMAT_INT, 97, 65536, 1, 32768, kChanInt16, 1},
    {"uint32", 32, SAMPLEFORMAT_UINT, 2654435761u, k2To32, 1, 0, kChanUInt32, 1},
    {"int32", 32, SAMPLEFORMAT_INT, 2654435761u, k2To32, 1, 2147483648.0, kChanInt32, 1},
    {"float32", 32, SAMPLEFORMAT_IEEEFP, 1, 4000, 0.25, 500, kChanFloat32, 1},
    {"complex int16", 32, SAMPLEFORMAT_COMPLEXINT, 97, 65536, 1, 32768, kChanInt16, 2},
    {"complex int32", 64, SAMPLEFORMAT_COMPLEXINT, 2654435761u, k2To32, 1, 2147483648.0, kChanInt32, 2},
    {"complex float32", 64, SAMPLEFORMAT_COMPLEXIEEEFP, 1, 4000, 0.25, 500, kChanFloat32, 2},
};
// clang-format on
const FormatCase &kUInt8 = kFormats[0];
const FormatCase &kUInt16 = kFormats[2];

struct LayoutCase {
    const char *name;
    uint16_t planarConfig;
    uint16_t compression;
    uint16_t predictor;
    uint32_t rowsPerStrip;
    uint32_t tileSize; // tiled when non-zero
    bool bigEndian;
};

constexpr uint16_t kContig = PLANARCONFIG_CONTIG;
constexpr uint16_t kSeparate = PLANARCONFIG_SEPARATE;
constexpr uint16_t kNone = COMPRESSION_NONE;
constexpr uint16_t kDeflate = COMPRESSION_ADOBE_DEFLATE;

// clang-format off
const LayoutCase kLayouts[] = {
    {"strips",                   kContig,   kNone,                PREDICTOR_NONE,       3, 0,  false},
    {"separate strips",          kSeparate, kNone,                PREDICTOR_NONE,       4, 0,  false},
    {"tiles",                    kContig,   kNone,                PREDICTOR_NONE,       0, 16, false},
    {"separate tiles",           kSeparate, kNone,                PREDICTOR_NONE,       0, 16, false},
    {"LZW strips",               kContig,   COMPRESSION_LZW,      PREDICTOR_NONE,       5, 0,  false},
    {"LZW tiles with predictor", kContig,   COMPRESSION_LZW,      PREDICTOR_HORIZONTAL, 0, 16, false},
    {"Deflate separate tiles",   kSeparate, kDeflate,             PREDICTOR_NONE,       0, 16, false},
    {"PackBits strips",          kContig,   COMPRESSION_PACKBITS, PREDICTOR_NONE,       7, 0,  false},
    {"big-endian strips",        kContig,   kNone,                PREDICTOR_NONE,       3, 0,  true},
    {"big-endian Deflate separate tiles", kSeparate, kDeflate,    PREDICTOR_NONE,       0, 16, true},
};
// clang-format on

TiffShape ShapeFor(const FormatCase &format, const LayoutCase &layout) {
    TiffShape shape;
    shape.width = kWidth;
    shape.height = kHeight;
    shape.samplesPerPixel = 2;
    shape.bitsPerSample = format.bitsPerSample;
    shape.sampleFormat = format.sampleFormat;
    shape.planarConfig = layout.planarConfig;
    shape.compression = layout.compression;
    shape.predictor = layout.predictor;
    shape.rowsPerStrip = layout.rowsPerStrip;
    shape.tileSize = layout.tileSize;
    shape.bigEndian = layout.bigEndian;
    return shape;
}

float ExpectedReal(double value) { return static_cast<float>(value); }

int32_t ExpectedInt(double value) {
    return static_cast<int32_t>(
        std::clamp(std::round(value), -2147483648.0, 2147483647.0));
}

// Reads a window and compares every output value with the value the file
// was written from, at the pixel the resampling rule names.
template <typename Out>
void ExpectWindow(GeoTiffImage &image, const rs2test::ElementValue &value,
                  Out (*expected)(double), const WindowRequest &w,
                  const std::vector<int32_t> &channels) {
    std::vector<Out> out(size_t(w.dstx) * w.dsty * channels.size());
    if constexpr (std::is_same_v<Out, float>)
        image.ReadReal32(w, channels, out.data());
    else
        image.ReadInt32(w, channels, out.data());
    size_t mismatches = 0;
    std::ostringstream first;
    size_t i = 0;
    for (int64_t j = 0; j < w.dsty; ++j) {
        const auto y = static_cast<uint32_t>(w.yoff + j * w.ysize / w.dsty);
        for (int64_t k = 0; k < w.dstx; ++k) {
            const auto x = static_cast<uint32_t>(w.xoff + k * w.xsize / w.dstx);
            for (int32_t channel : channels) {
                const Out want = expected(value(x, y, channel - 1));
                if (out[i] != want && mismatches++ == 0)
                    first << "output (" << k << "," << j << ") channel "
                          << channel << ": " << out[i] << " instead of "
                          << want;
                ++i;
            }
        }
    }
    EXPECT_EQ(mismatches, 0u) << first.str();
}

TEST(GeoTiffImage, windows_match_the_written_samples_in_every_layout) {
    TempDir dir;
    for (const FormatCase &format : kFormats) {
        for (const LayoutCase &layout : kLayouts) {
            SCOPED_TRACE(std::string(format.name) + ", " + layout.name);
            const std::string path = dir.File("image.tif");
            rs2test::WriteTiff(path, ShapeFor(format, layout), format.Values());
            std::unique_ptr<GeoTiffImage> image = GeoTiffImage::Open(path);
            const int32_t last = 2 * format.channelsPerSample;
            ASSERT_EQ(image->ChannelCount(), last);
            EXPECT_EQ(image->ChannelType(), format.channelType);
            std::vector<int32_t> all;
            for (int32_t c = 1; c <= last; ++c)
                all.push_back(c);
            const struct {
                WindowRequest window;
                std::vector<int32_t> channels;
            } reads[] = {
                {{0, 0, int32_t(kWidth), int32_t(kHeight), int32_t(kWidth),
                  int32_t(kHeight)},
                 all},
                {{3, 2, 30, 25, 7, 6}, {last, 1, last}}, // down-sampled
                {{5, 4, 6, 5, 17, 11}, {2, 2, 1}},       // up-sampled
            };
            for (const auto &read : reads) {
                ExpectWindow(*image, format.Values(), ExpectedReal, read.window,
                             read.channels);
                ExpectWindow(*image, format.Values(), ExpectedInt, read.window,
                             read.channels);
            }
        }
    }
}

// The driver checks an image's sample layout before reading it, so the
// facts must tell apart layouts that share a channel type (int8 and int16,
// complex int16 and two int16 samples) and complex int16 from complex int32.
TEST(GeoTiffImage, sample_layout_is_told_as_the_file_declares_it) {
    TempDir dir;
    const std::string path = dir.File("image.tif");
    for (const FormatCase &format : kFormats) {
        SCOPED_TRACE(format.name);
        rs2test::WriteTiff(path, ShapeFor(format, kLayouts[0]),
                           format.Values());
        FILE *fp = VXBOpen(path.c_str(), "r");
        ASSERT_NE(fp, nullptr);
        int32_t sampleFormat = 0, bits = 0, samples = 0;
        EXPECT_TRUE(VXBSampleLayout(fp, &sampleFormat, &bits, &samples));
        VXBClose(fp);
        EXPECT_EQ(sampleFormat, format.sampleFormat);
        EXPECT_EQ(bits, format.bitsPerSample);
        EXPECT_EQ(samples, 2);
    }
    int32_t sampleFormat = -1;
    EXPECT_FALSE(VXBSampleLayout(nullptr, &sampleFormat, nullptr, nullptr));
    EXPECT_EQ(sampleFormat, 0);
}

void Corrupt(const std::string &path, const std::vector<uint32_t> &blocks) {
    const auto stored = rs2test::StoredBlocks(path);
    std::fstream file(path, std::ios::in | std::ios::out | std::ios::binary);
    for (uint32_t block : blocks) {
        file.seekp(std::streamoff(stored.at(block).first));
        file << std::string(stored.at(block).second, '\xFF');
    }
}

template <typename Out> std::vector<Out> Sentinels(size_t count) {
    return std::vector<Out>(count, Out(-12345));
}

// Room for the output of a sane request, so that a read that writes when it
// should not is caught by the sentinels rather than by a crash.
size_t SentinelCount(const WindowRequest &window, size_t channels) {
    const double needed = double(std::max(window.dstx, 1)) *
                          std::max(window.dsty, 1) *
                          double(std::max<size_t>(channels, 1));
    return needed <= 1e6 ? std::max<size_t>(64, size_t(needed)) : 64;
}

void ExpectReadFailsWritingNothing(GeoTiffImage &image,
                                   const WindowRequest &window,
                                   const std::vector<int32_t> &channels) {
    const size_t count = SentinelCount(window, channels.size());
    std::vector<float> reals = Sentinels<float>(count);
    std::vector<int32_t> ints = Sentinels<int32_t>(count);
    EXPECT_THROW(image.ReadReal32(window, channels, reals.data()),
                 ReportedError);
    EXPECT_THROW(image.ReadInt32(window, channels, ints.data()), ReportedError);
    EXPECT_EQ(reals, Sentinels<float>(count));
    EXPECT_EQ(ints, Sentinels<int32_t>(count));
}

// Expects call to raise a reported error whose message names path.
template <typename Call>
void ExpectErrorNaming(const std::string &path, Call call) {
    try {
        call();
        ADD_FAILURE() << "no error reported";
    } catch (const ReportedError &error) {
        EXPECT_NE(std::string(error.what()).find(path), std::string::npos)
            << error.what();
    }
}

TEST(GeoTiffImage, decodes_only_the_blocks_a_window_needs) {
    struct Case {
        const char *what;
        uint32_t rowsPerStrip;
        uint32_t tileSize;
        std::vector<uint32_t> corrupted; // blocks overwritten with garbage
        WindowRequest avoiding;          // samples none of them
        WindowRequest needing;           // samples some of them
    };
    // clang-format off
    const Case cases[] = {
        {"odd strips", 1, 0, {1, 3, 5, 7, 9, 11, 13, 15, 17, 19, 21, 23, 25, 27},
         {0, 0, 37, 28, 37, 14}, {0, 0, 37, 29, 37, 29}},
        {"middle tile column", 0, 16, {1, 4}, {32, 0, 5, 29, 5, 29}, {10, 0, 10, 5, 10, 5}},
    };
    // clang-format on
    TempDir dir;
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        const LayoutCase layout = {c.what,         kContig,        kDeflate,
                                   PREDICTOR_NONE, c.rowsPerStrip, c.tileSize,
                                   false};
        const std::string path = dir.File("corrupt.tif");
        rs2test::WriteTiff(path, ShapeFor(kUInt16, layout), kUInt16.Values());
        Corrupt(path, c.corrupted);
        std::unique_ptr<GeoTiffImage> image = GeoTiffImage::Open(path);
        ExpectWindow(*image, kUInt16.Values(), ExpectedReal, c.avoiding,
                     {2, 1});
        ExpectReadFailsWritingNothing(*image, c.needing, {2, 1});
    }
}

TEST(GeoTiffImage, refuses_bad_requests_without_writing) {
    TempDir dir;
    const std::string path = dir.File("image.tif");
    rs2test::WriteTiff(path, ShapeFor(kUInt16, kLayouts[0]), kUInt16.Values());
    std::unique_ptr<GeoTiffImage> image = GeoTiffImage::Open(path);
    const int32_t big = std::numeric_limits<int32_t>::max();
    struct Case {
        const char *what;
        WindowRequest window;
        std::vector<int32_t> channels;
    };
    // clang-format off
    const Case cases[] = {
        {"left of the image", {-1, 0, 5, 5, 5, 5}, {1}},
        {"above the image", {0, -1, 5, 5, 5, 5}, {1}},
        {"past the right edge", {33, 0, 5, 5, 5, 5}, {1}},
        {"past the bottom", {0, 25, 5, 5, 5, 5}, {1}},
        {"offset overflowing int32", {big, 0, big, 5, 5, 5}, {1}},
        {"zero width", {0, 0, 0, 5, 5, 5}, {1}},
        {"negative height", {0, 0, 5, -2, 5, 5}, {1}},
        {"zero output width", {0, 0, 5, 5, 0, 5}, {1}},
        {"negative output height", {0, 0, 5, 5, 5, -1}, {1}},
        {"channel 0", {0, 0, 5, 5, 5, 5}, {1, 0}},
        {"channel past the last", {0, 0, 5, 5, 5, 5}, {3}},
        {"negative channel", {0, 0, 5, 5, 5, 5}, {-1}},
        {"no channel", {0, 0, 5, 5, 5, 5}, {}},
        {"output beyond addressable memory", {0, 0, 5, 5, big, big}, {1, 1, 1, 1}},
    };
    // clang-format on
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        ExpectReadFailsWritingNothing(*image, c.window, c.channels);
    }
    ExpectErrorNaming(path, [&] {
        image->ReadReal32({0, 0, 0, 1, 1, 1}, {1}, nullptr);
    });
    EXPECT_THROW(image->ReadInt32({0, 0, 5, 5, 5, 5}, {1}, nullptr),
                 ReportedError);
}

// The list of a request far outside the image is never read: it claims far
// more channels than it holds, which copying it would reveal.
TEST(GeoTiffImage, window_outside_is_refused_before_anything_is_allocated) {
    TempDir dir;
    const std::string path = dir.File("image.tif");
    rs2test::WriteTiff(path, ShapeFor(kUInt16, kLayouts[0]), kUInt16.Values());
    FILE *fp = VXBOpen(path.c_str(), "r");
    ASSERT_NE(fp, nullptr);
    const int32_t big = std::numeric_limits<int32_t>::max();
    const int32_t channel = 1;
    const WindowRequest windows[] = {{big - 1, 0, 1, 1, 1, 1},
                                     {0, big - 1, 1, 1, 1, 1},
                                     {-big, -big, 1, 1, 1, 1}};
    for (const WindowRequest &w : windows) {
        std::vector<int32_t> ints = Sentinels<int32_t>(1);
        std::vector<float> reals = Sentinels<float>(1);
        EXPECT_THROW(VXBInt32ChanIO(fp, 0, w.xoff, w.yoff, w.xsize, w.ysize,
                                    ints.data(), w.dstx, w.dsty, big, &channel),
                     ReportedError);
        EXPECT_THROW(VXBReal32ChanIO(fp, 0, w.xoff, w.yoff, w.xsize, w.ysize,
                                     reals.data(), w.dstx, w.dsty, big,
                                     &channel),
                     ReportedError);
        EXPECT_EQ(ints, Sentinels<int32_t>(1));
        EXPECT_EQ(reals, Sentinels<float>(1));
    }
    VXBClose(fp);
    // The application API allocates the output of a read; it must not for
    // a window outside, whatever output size is asked for.
    const host::Raster raster = host::OpenRaster(path);
    for (const WindowRequest &w : windows) {
        EXPECT_THROW(
            raster.ReadInt32({w.xoff, w.yoff, w.xsize, w.ysize}, big, big, {1}),
            host::Error);
        EXPECT_THROW(raster.ReadReal32({w.xoff, w.yoff, w.xsize, w.ysize}, big,
                                       big, {1}),
                     host::Error);
    }
}

TEST(GeoTiffImage, refuses_files_it_cannot_decode) {
    struct Case {
        const char *what;
        uint16_t bitsPerSample;
        uint16_t sampleFormat;
        uint16_t photometric;
    };
    constexpr uint16_t kGrey = PHOTOMETRIC_MINISBLACK;
    const Case cases[] = {
        {"1-bit samples", 1, SAMPLEFORMAT_UINT, kGrey},
        {"12-bit samples", 12, SAMPLEFORMAT_UINT, kGrey},
        {"64-bit floats", 64, SAMPLEFORMAT_IEEEFP, kGrey},
        {"complex doubles", 128, SAMPLEFORMAT_COMPLEXIEEEFP, kGrey},
        {"complex 8-bit integers", 16, SAMPLEFORMAT_COMPLEXINT, kGrey},
        {"subsampled YCbCr", 8, SAMPLEFORMAT_UINT, PHOTOMETRIC_YCBCR},
    };
    TempDir dir;
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        TiffShape shape;
        shape.width = 16;
        shape.height = 16;
        shape.bitsPerSample = c.bitsPerSample;
        shape.sampleFormat = c.sampleFormat;
        shape.photometric = c.photometric;
        shape.samplesPerPixel = c.photometric == PHOTOMETRIC_YCBCR ? 3 : 1;
        shape.rowsPerStrip = 16;
        const std::string path = dir.File("unsupported.tif");
        rs2test::WriteTiff(path, shape, kUInt8.Values());
        EXPECT_TRUE(host::HasTiffSignature(path));
        ExpectErrorNaming(path, [&] { GeoTiffImage::Open(path); });
    }
    // No TIFF signature: text, no bytes at all.
    for (const char *text : {"this is not an image\n", ""}) {
        const std::string path = dir.File("notes.tif");
        rs2test::WriteFile(path, text);
        EXPECT_FALSE(host::HasTiffSignature(path));
        EXPECT_THROW(GeoTiffImage::Open(path), ReportedError);
    }
    EXPECT_THROW(GeoTiffImage::Open(dir.File("missing.tif")), ReportedError);
}

TEST(GeoTiffImage, truncated_file_fails_to_open_or_to_read) {
    TempDir dir;
    const std::string path = dir.File("cut.tif");
    rs2test::WriteTiff(path, ShapeFor(kFormats[3], kLayouts[5]),
                       kFormats[3].Values());
    // The second half, with the directory libtiff writes last, is gone.
    std::filesystem::resize_file(path, std::filesystem::file_size(path) / 2);
    std::unique_ptr<GeoTiffImage> image;
    try {
        image = GeoTiffImage::Open(path);
    } catch (const ReportedError &error) {
        EXPECT_NE(std::string(error.what()).find(path), std::string::npos);
        return;
    }
    ExpectReadFailsWritingNothing(*image, {0, 0, 37, 29, 37, 29}, {1, 2});
}

// A file shrunk by another process while it is open must give a read error,
// never a signal: libtiff itself decodes a block of it after the cut, and so
// does the reader.
TEST(GeoTiffImage, file_truncated_while_open_gives_a_read_error) {
    TempDir dir;
    const std::string path = dir.File("shrinking.tif");
    TiffShape shape;
    shape.width = 1024;
    shape.height = 1024;
    shape.tileSize = 512;
    rs2test::WriteTiff(path, shape, kUInt16.Values());
    const host::TiffFile file(path);
    std::unique_ptr<GeoTiffImage> image = GeoTiffImage::Open(path);
    std::filesystem::resize_file(path, std::filesystem::file_size(path) / 4);
    std::vector<unsigned char> tile(512 * 512 * 2);
    EXPECT_EQ(TIFFReadEncodedTile(file.Handle(), 3, tile.data(),
                                  tmsize_t(tile.size())),
              -1);
    ExpectReadFailsWritingNothing(*image, {512, 512, 512, 512, 1, 1}, {1});
}

std::string LittleEndian32(uint64_t value) {
    std::string bytes;
    for (int i = 0; i < 4; ++i)
        bytes += char((value >> (8 * i)) & 0xFF);
    return bytes;
}

TEST(GeoTiffImage, missing_uncompressed_strip_is_refused_before_writing) {
    TempDir dir;
    const std::string path = dir.File("short.tif");
    TiffShape shape;
    shape.width = 10;
    shape.height = 8;
    shape.bitsPerSample = 8;
    shape.rowsPerStrip = 4;
    const rs2test::ElementValue value = [](uint32_t x, uint32_t y, uint32_t) {
        return double(y * 10 + x);
    };
    rs2test::WriteTiff(path, shape, value);
    // Point the second strip at the end of the file: its data is missing.
    const auto strips = rs2test::StoredBlocks(path);
    ASSERT_EQ(strips.size(), 2u);
    std::string bytes = rs2test::FileText(path);
    const size_t offsets = bytes.find(LittleEndian32(strips[0].first) +
                                      LittleEndian32(strips[1].first));
    ASSERT_NE(offsets, std::string::npos);
    bytes.replace(offsets + 4, 4, LittleEndian32(bytes.size()));
    rs2test::WriteFile(path, bytes);
    std::unique_ptr<GeoTiffImage> image = GeoTiffImage::Open(path);
    ExpectWindow(*image, value, ExpectedInt, {0, 0, 10, 4, 10, 4}, {1});
    ExpectReadFailsWritingNothing(*image, {0, 0, 10, 8, 10, 8}, {1});
}

// A Deflate file of one strip of width x height 8-bit samples that stores
// only `stored` bytes of compressed data.
void WriteDeflateStrip(const std::string &path, uint32_t width, uint32_t height,
                       const std::string &stored) {
    TIFF *tif = TIFFOpen(path.c_str(), "w");
    ASSERT_NE(tif, nullptr);
    TIFFSetField(tif, TIFFTAG_IMAGEWIDTH, width);
    TIFFSetField(tif, TIFFTAG_IMAGELENGTH, height);
    TIFFSetField(tif, TIFFTAG_BITSPERSAMPLE, 8);
    TIFFSetField(tif, TIFFTAG_SAMPLESPERPIXEL, 1);
    TIFFSetField(tif, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
    TIFFSetField(tif, TIFFTAG_COMPRESSION, COMPRESSION_ADOBE_DEFLATE);
    TIFFSetField(tif, TIFFTAG_ROWSPERSTRIP, height);
    std::string data = stored;
    TIFFWriteRawStrip(tif, 0, data.data(), static_cast<tmsize_t>(data.size()));
    TIFFClose(tif);
}

TEST(GeoTiffImage, compressed_strip_too_small_for_its_size_is_refused) {
    TempDir dir;
    // 40 bytes that would have to expand to 240 MB: refused before anything
    // is allocated for the strip.
    const std::string claimed = dir.File("claimed.tif");
    WriteDeflateStrip(claimed, 800, 300000, std::string(40, 'x'));
    std::unique_ptr<GeoTiffImage> image = GeoTiffImage::Open(claimed);
    try {
        std::vector<float> values(800);
        image->ReadReal32({0, 0, 800, 1, 800, 1}, {1}, values.data());
        ADD_FAILURE() << "read a strip that cannot hold its size";
    } catch (const ReportedError &error) {
        EXPECT_NE(std::string(error.what()).find("too few to hold"),
                  std::string::npos)
            << error.what();
    }
    // Zeros compress about a thousand times: such a strip is read.
    const std::string zeros = dir.File("zeros.tif");
    TiffShape shape;
    shape.width = 2000;
    shape.height = 2000;
    shape.bitsPerSample = 8;
    shape.rowsPerStrip = 2000;
    shape.compression = COMPRESSION_ADOBE_DEFLATE;
    const rs2test::ElementValue zero = [](uint32_t, uint32_t, uint32_t) {
        return 0.0;
    };
    rs2test::WriteTiff(zeros, shape, zero);
    ASSERT_LT(std::filesystem::file_size(zeros), 2000u * 2000u / 500u);
    ExpectWindow(*GeoTiffImage::Open(zeros), zero, ExpectedInt,
                 {0, 1990, 2000, 10, 2000, 10}, {1});
}

// Sets the process's budget for decoded blocks for the life of a test.
class BudgetForTest {
  public:
    explicit BudgetForTest(uint64_t bytes) {
        host::SetBlockMemoryBudget(bytes);
    }
    ~BudgetForTest() {
        host::SetBlockMemoryBudget(host::kDefaultBlockMemoryBudget);
    }
};

TEST(GeoTiffImage, decoded_blocks_of_all_open_images_share_one_budget) {
    TempDir dir;
    TiffShape shape; // one Deflate strip of 614400 bytes
    shape.width = 600;
    shape.height = 512;
    shape.rowsPerStrip = 512;
    shape.compression = COMPRESSION_ADOBE_DEFLATE;
    const std::string first = dir.File("first.tif");
    const std::string second = dir.File("second.tif");
    rs2test::WriteTiff(first, shape, kUInt16.Values());
    rs2test::WriteTiff(second, shape, kUInt16.Values());
    const BudgetForTest budget(1 << 20);
    std::unique_ptr<GeoTiffImage> firstImage = GeoTiffImage::Open(first);
    std::unique_ptr<GeoTiffImage> secondImage = GeoTiffImage::Open(second);
    const WindowRequest pixel = {599, 511, 1, 1, 1, 1};
    ExpectWindow(*firstImage, kUInt16.Values(), ExpectedInt, pixel, {1});
    EXPECT_EQ(host::BlockMemoryInUse(), 614400u);
    ExpectReadFailsWritingNothing(*secondImage, pixel, {1});
    ExpectErrorNaming(second, [&] {
        float value = 0;
        secondImage->ReadReal32(pixel, {1}, &value);
    });
    firstImage.reset(); // gives its row of blocks back
    EXPECT_EQ(host::BlockMemoryInUse(), 0u);
    ExpectWindow(*secondImage, kUInt16.Values(), ExpectedInt, pixel, {1});
    // A row of blocks the budget could never hold is refused at once.
    host::SetBlockMemoryBudget(600000);
    ExpectErrorNaming(first, [&] { GeoTiffImage::Open(first); });
}

// Rewrites the file's block offsets so that every block is the first one's
// data; the blocks must have been written with equal contents.
void PointEveryBlockAtTheFirst(const std::string &path) {
    const auto stored = rs2test::StoredBlocks(path);
    std::string offsets, first;
    for (const auto &[offset, count] : stored) {
        ASSERT_EQ(count, stored[0].second);
        offsets += LittleEndian32(offset);
        first += LittleEndian32(stored[0].first);
    }
    std::string bytes = rs2test::FileText(path);
    const size_t at = bytes.find(offsets);
    ASSERT_NE(at, std::string::npos);
    bytes.replace(at, offsets.size(), first);
    rs2test::WriteFile(path, bytes);
}

TEST(GeoTiffImage, blocks_sharing_one_stream_are_decoded_once) {
    const rs2test::ElementValue periodic = [](uint32_t x, uint32_t y,
                                              uint32_t e) {
        return double((x % 16) * 31 + (y % 4) * 5 + e * 3);
    };
    TempDir dir;
    for (const uint32_t tileSize : {0u, 16u}) {
        SCOPED_TRACE(tileSize != 0 ? "tiles" : "strips");
        const LayoutCase layout = {"shared", kContig,  kDeflate, PREDICTOR_NONE,
                                   4,        tileSize, false};
        TiffShape shape = ShapeFor(kUInt16, layout);
        shape.width = 64;
        shape.height = 32;
        const std::string path = dir.File("shared.tif");
        rs2test::WriteTiff(path, shape, periodic);
        PointEveryBlockAtTheFirst(path);
        std::unique_ptr<GeoTiffImage> image = GeoTiffImage::Open(path);
        ExpectWindow(*image, periodic, ExpectedInt, {0, 0, 64, 1, 64, 1},
                     {1, 2});
        // The shared stream turns to garbage: the blocks of the last row are
        // the ones already decoded, so they are not decoded again.
        Corrupt(path, {0});
        ExpectWindow(*image, periodic, ExpectedInt, {0, 31, 64, 1, 64, 1},
                     {1, 2});
    }
}

// GeoKeyDirectory entries (key, value) of the georeferencing cases.
std::vector<uint16_t> GeographicKeys(uint16_t gcs, uint16_t rasterType = 1) {
    return {1024, 2, 1025, rasterType, 2048, gcs}; // model type geographic
}
std::vector<uint16_t> ProjectedKeys(uint16_t pcs) {
    return {1024, 1, 1025, 1, 3072, pcs}; // model type projected, area
}
constexpr uint16_t kPixelIsPoint = 2;

using Transform = std::array<double, 6>;
constexpr Transform kIdentity = {0, 1, 0, 0, 0, 1};

TEST(GeoTiffImage, georeferencing_gives_the_system_transform_and_tie_points) {
    struct Case {
        const char *what;
        std::vector<uint16_t> keys;
        std::vector<double> pixelScale, tiePoints, matrix;
        const char *geosys;
        Transform transform;
        const char *tieGeosys;
        std::array<double, 2> utmParms; // zone, hemisphere (UTM only)
    };
    const std::vector<double> cornerTie = {0, 0, 0, -120.5, 45.25, 0};
    const std::vector<double> scale = {0.001, 0.002, 0};
    const std::vector<double> fourTies = {
        0, 0,  0, -120.0, 45.0, 10, 36, 0,  0, -119.9, 45.0, 11,
        0, 28, 0, -120.0, 44.9, 12, 36, 28, 0, -119.9, 44.9, 13};
    const std::vector<double> rotated = {0.001,  0.0002, 0, -120, // X row
                                         0.0001, -0.002, 0, 45,   // Y row
                                         0,      0,      0, 0,    // Z row
                                         0,      0,      0, 1};
    // clang-format off
    const Case cases[] = {
        {"geographic with pixel scale", GeographicKeys(4326), scale, cornerTie, {},
         "LONG D000", {-120.5, 0.001, 0, 45.25, 0, -0.002}, "LONG D000", {}},
        {"tie point inside the image", GeographicKeys(4326), scale, {10, 20, 0, -120.5, 45.25, 0}, {},
         "LONG D000", {-120.51, 0.001, 0, 45.29, 0, -0.002}, "LONG D000", {}},
        {"pixel is point", GeographicKeys(4326, kPixelIsPoint), scale, cornerTie, {},
         "LONG D000", {-120.5005, 0.001, 0, 45.251, 0, -0.002}, "LONG D000", {}},
        {"rotated transformation matrix", GeographicKeys(4326), {}, {}, rotated,
         "LONG D000", {-120, 0.001, 0.0002, 45, 0.0001, -0.002}, "LONG D000", {}},
        {"UTM north", ProjectedKeys(32610), {10, 10, 0}, {0, 0, 0, 500000, 5000000, 0}, {},
         "UTM 10 T D000", {500000, 10, 0, 5000000, 0, -10}, "UTM 10 T D000", {10, 1}},
        {"UTM south", ProjectedKeys(32733), {10, 10, 0}, {0, 0, 0, 500000, 7000000, 0}, {},
         "UTM 33 J D000", {500000, 10, 0, 7000000, 0, -10}, "UTM 33 J D000", {33, -1}},
        {"UTM north, centre south of the equator", ProjectedKeys(32631), {10, 10, 0}, {0, 0, 0, 500000, 100, 0}, {},
         "UTM 31 N D000", {500000, 10, 0, 100, 0, -10}, "UTM 31 N D000", {31, 1}},
        {"tie points only", GeographicKeys(4326), {}, fourTies, {},
         "PIXEL", kIdentity, "LONG D000", {}},
        {"UTM tie points only", ProjectedKeys(32610), {}, {0, 0, 0, 500000, 5000000, 0, 36, 28, 0, 500360, 4999720, 0}, {},
         "PIXEL", kIdentity, "UTM 10 T D000", {}},
        {"unsupported projection", ProjectedKeys(3857), {10, 10, 0}, {0, 0, 0, 500000, 100, 0}, {},
         "PIXEL", kIdentity, "PIXEL", {}},
        {"another datum", GeographicKeys(4267), scale, cornerTie, {},
         "PIXEL", kIdentity, "PIXEL", {}},
        {"no georeferencing", {}, {}, {}, {},
         "PIXEL", kIdentity, "PIXEL", {}},
    };
    // clang-format on
    TempDir dir;
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        TiffShape shape = ShapeFor(kUInt8, kLayouts[0]);
        shape.geoKeys = c.keys;
        shape.pixelScale = c.pixelScale;
        shape.tiePoints = c.tiePoints;
        shape.transformMatrix = c.matrix;
        const std::string path = dir.File("geo.tif");
        rs2test::WriteTiff(path, shape, kUInt8.Values());
        std::unique_ptr<GeoTiffImage> image = GeoTiffImage::Open(path);
        const ProjInfo_t projection = image->Projection();
        EXPECT_STREQ(projection.geosys, c.geosys);
        for (int i = 0; i < 6; ++i)
            EXPECT_NEAR(projection.transform[i], c.transform[i], 1e-9)
                << "coefficient " << i;
        if (DecodeGeosys(c.geosys, nullptr) == kGeosysUTM) {
            EXPECT_EQ(projection.parms[0], c.utmParms[0]);
            EXPECT_EQ(projection.parms[1], c.utmParms[1]);
        }
        EXPECT_EQ(image->TiePointGeosys(), c.tieGeosys);
        const std::vector<host::TiePoint> &ties = image->TiePoints();
        ASSERT_EQ(ties.size(), c.tiePoints.size() / 6);
        for (size_t i = 0; i < ties.size(); ++i) {
            const double *t = &c.tiePoints[6 * i];
            EXPECT_EQ(ties[i].pixel, t[0]);
            EXPECT_EQ(ties[i].line, t[1]);
            EXPECT_EQ(ties[i].x, t[3]);
            EXPECT_EQ(ties[i].y, t[4]);
            EXPECT_EQ(ties[i].z, t[5]);
        }
        EXPECT_TRUE(image->RpcBlock().empty());
    }
}

struct RecordKeeper {
    void operator()(RFInfo_t *record) const { RFDeallocate(record); }
};

std::vector<double> RpcValues() {
    std::vector<double> values(92);
    for (size_t i = 0; i < values.size(); ++i)
        values[i] = 0.5 + double(i);
    return values;
}

std::unique_ptr<GeoTiffImage> OpenWithRpc(const TempDir &dir,
                                          const std::vector<double> &values) {
    TiffShape shape = ShapeFor(kUInt16, kLayouts[0]);
    shape.rpcCoefficients = values;
    const std::string path = dir.File("rpc.tif");
    rs2test::WriteTiff(path, shape, kUInt16.Values());
    return GeoTiffImage::Open(path);
}

TEST(GeoTiffImage, rpc_tag_becomes_an_rf_block) {
    TempDir dir;
    const std::vector<double> v = RpcValues();
    std::unique_ptr<GeoTiffImage> image = OpenWithRpc(dir, v);
    const std::vector<unsigned char> &block = image->RpcBlock();
    ASSERT_EQ(block.size(), size_t(kRFBlockSize));
    std::unique_ptr<RFInfo_t, RecordKeeper> record(
        VXBBinaryToRFInfo(block.data(), int32_t(block.size())));
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(record->width, int32_t(kWidth));
    EXPECT_EQ(record->height, int32_t(kHeight));
    const std::pair<double, double> scalars[] = {
        {record->lineOffset, v[2]},      {record->pixelOffset, v[3]},
        {record->latitudeOffset, v[4]},  {record->longitudeOffset, v[5]},
        {record->heightOffset, v[6]},    {record->lineScale, v[7]},
        {record->pixelScale, v[8]},      {record->latitudeScale, v[9]},
        {record->longitudeScale, v[10]}, {record->heightScale, v[11]},
    };
    for (const auto &[got, want] : scalars)
        EXPECT_EQ(got, want);
    for (int i = 0; i < 20; ++i) {
        EXPECT_EQ(record->lineNumeratorCoefficients[i], v[12 + i]);
        EXPECT_EQ(record->lineDenominatorCoefficients[i], v[32 + i]);
        EXPECT_EQ(record->pixelNumeratorCoefficients[i], v[52 + i]);
        EXPECT_EQ(record->pixelDenominatorCoefficients[i], v[72 + i]);
    }
    EXPECT_STREQ(record->geosys, "LONG D000");
    EXPECT_STREQ(record->projection->geosys, "PIXEL");
}

TEST(GeoTiffImage, malformed_rpc_tag_gives_no_block) {
    std::vector<double> shortTag = RpcValues();
    shortTag.pop_back(); // 91 values
    std::vector<double> zeroScale = RpcValues();
    zeroScale[8] = 0.0; // SAMP_SCALE 0 would divide by zero
    std::vector<double> notANumber = RpcValues();
    notANumber[40] = std::nan(""); // a LINE_DEN coefficient
    TempDir dir;
    for (const auto &values : {shortTag, zeroScale, notANumber}) {
        SCOPED_TRACE(values.size());
        EXPECT_TRUE(OpenWithRpc(dir, values)->RpcBlock().empty());
    }
}

} // namespace
