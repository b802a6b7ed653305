#include "host/GeoTiffWriter.hpp"
#include "host/Raster.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TiffInspection.hpp"
#include "tests/support/TiffPixels.hpp"

#include <geotiffio.h>
#include <geovalues.h>
#include <gtest/gtest.h>
#include <tiffio.h>
#include <xtiffio.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <memory>
#include <signal.h>
#include <sys/resource.h>
#include <unistd.h>
#include <vector>

namespace {

struct TiffCloser {
    void operator()(TIFF *tiff) const { XTIFFClose(tiff); }
};
using TiffKeeper = std::unique_ptr<TIFF, TiffCloser>;
struct GtifDeleter {
    void operator()(GTIF *gtif) const { GTIFFree(gtif); }
};
using GtifKeeper = std::unique_ptr<GTIF, GtifDeleter>;

TiffKeeper OpenForReading(const std::string &path) {
    return TiffKeeper(XTIFFOpen(path.c_str(), "r"));
}

template <typename T> T Field(TIFF *tiff, ttag_t tag) {
    T value{};
    TIFFGetFieldDefaulted(tiff, tag, &value);
    return value;
}

using rs2test::DoubleArray;
using rs2test::ShortKey;

// Bytes 2-3 of a little-endian TIFF header: 42 classic, 43 BigTIFF.
int TiffVersion(const std::string &path) {
    std::ifstream file(path, std::ios::binary);
    unsigned char header[4] = {};
    file.read(reinterpret_cast<char *>(header), sizeof header);
    return header[2] | header[3] << 8;
}

// Deterministic, distinct bytes for every position of the image.
std::vector<unsigned char> Pattern(size_t bytes) {
    std::vector<unsigned char> data(bytes);
    for (size_t i = 0; i < bytes; ++i)
        data[i] = static_cast<unsigned char>(((i * 7919u) >> 3) ^ i);
    return data;
}

} // namespace

TEST(GeoTiffWriter, sample_types_have_their_tiff_layout_and_round_trip) {
    using Compression = host::GeoTiffCompression;
    struct Case {
        host::SampleType type;
        int32_t channels;
        Compression compression;
        uint16_t bits, format, samples;
        size_t pixelBytes;
        uint16_t scheme, predictor;
    };
    // clang-format off
    const Case cases[] = {
        {host::SampleType::Float32, 1, Compression::None, 32, SAMPLEFORMAT_IEEEFP, 1, 4, COMPRESSION_NONE, PREDICTOR_NONE},
        {host::SampleType::Float32, 3, Compression::Deflate, 32, SAMPLEFORMAT_IEEEFP, 3, 12, COMPRESSION_ADOBE_DEFLATE, PREDICTOR_FLOATINGPOINT},
        {host::SampleType::ComplexFloat32, 2, Compression::None, 64, SAMPLEFORMAT_COMPLEXIEEEFP, 2, 16, COMPRESSION_NONE, PREDICTOR_NONE},
        {host::SampleType::ComplexFloat32, 1, Compression::Zstd, 64, SAMPLEFORMAT_COMPLEXIEEEFP, 1, 8, COMPRESSION_ZSTD, PREDICTOR_NONE},
        {host::SampleType::Int32, 2, Compression::None, 32, SAMPLEFORMAT_INT, 2, 8, COMPRESSION_NONE, PREDICTOR_NONE},
        {host::SampleType::Int32, 1, Compression::Zstd, 32, SAMPLEFORMAT_INT, 1, 4, COMPRESSION_ZSTD, PREDICTOR_HORIZONTAL},
        {host::SampleType::ComplexInt16, 2, Compression::None, 32, SAMPLEFORMAT_COMPLEXINT, 2, 8, COMPRESSION_NONE, PREDICTOR_NONE},
        {host::SampleType::ComplexInt16, 2, Compression::Lzw, 32, SAMPLEFORMAT_COMPLEXINT, 2, 8, COMPRESSION_LZW, PREDICTOR_HORIZONTAL},
    };
    // clang-format on
    rs2test::TempDir folder;
    // Two columns and three rows of tiles, those at the right and bottom
    // edges partly outside the image.
    const int32_t width = 530;
    const int32_t height = 1030;
    for (const Case &c : cases) {
        const std::string label = std::to_string(c.bits) + " bits, " +
                                  std::to_string(c.channels) + " channel(s), " +
                                  host::CompressionName(c.compression);
        const std::string path = folder.File("layout.tif");
        const std::vector<unsigned char> data =
            Pattern(c.pixelBytes * width * height);
        {
            host::GeoTiffWriter writer(path, width, height, c.channels, c.type,
                                       c.compression);
            ASSERT_EQ(writer.RowBytes(), c.pixelBytes * width);
            const int32_t tileRow = writer.RowsPerTileRow();
            // Bands that start and end inside rows of tiles, then whole ones.
            int32_t row = 0;
            for (int32_t rows : {1, tileRow + 1, 2 * tileRow, height}) {
                rows = std::min(rows, height - row);
                writer.WriteRows(row, rows,
                                 data.data() + writer.RowBytes() * row);
                row += rows;
            }
            writer.Close();
        }
        TiffKeeper tiff = OpenForReading(path);
        ASSERT_TRUE(tiff) << label;
        EXPECT_EQ(Field<uint16_t>(tiff.get(), TIFFTAG_BITSPERSAMPLE), c.bits);
        EXPECT_EQ(Field<uint16_t>(tiff.get(), TIFFTAG_SAMPLEFORMAT), c.format);
        EXPECT_EQ(Field<uint16_t>(tiff.get(), TIFFTAG_SAMPLESPERPIXEL),
                  c.samples);
        EXPECT_EQ(Field<uint32_t>(tiff.get(), TIFFTAG_TILEWIDTH), 512u);
        EXPECT_EQ(Field<uint32_t>(tiff.get(), TIFFTAG_TILELENGTH), 512u);
        EXPECT_EQ(Field<uint16_t>(tiff.get(), TIFFTAG_COMPRESSION), c.scheme)
            << label;
        // libtiff knows the predictor only of files it decompresses.
        if (c.scheme != COMPRESSION_NONE) {
            EXPECT_EQ(Field<uint16_t>(tiff.get(), TIFFTAG_PREDICTOR),
                      c.predictor)
                << label;
        }
        EXPECT_EQ(rs2test::ReadPixels(tiff.get()), data) << label;
        EXPECT_EQ(TiffVersion(path), 42);
    }
}

TEST(GeoTiffWriter, rows_must_come_in_order_and_all_of_them) {
    rs2test::TempDir folder;
    const std::vector<unsigned char> row(4 * 10);
    host::GeoTiffWriter writer(folder.File("order.tif"), 10, 5, 1,
                               host::SampleType::Float32);
    writer.WriteRows(0, 1, row.data());
    EXPECT_THROW(writer.WriteRows(0, 1, row.data()), std::invalid_argument);
    EXPECT_THROW(writer.WriteRows(2, 1, row.data()), std::invalid_argument);
    EXPECT_THROW(writer.WriteRows(1, 5, row.data()), std::invalid_argument);
    writer.WriteRows(1, 1, row.data());
    try {
        writer.Close();
        ADD_FAILURE() << "closing after 2 of 5 rows succeeded";
    } catch (const host::Error &error) {
        EXPECT_EQ(error.Code(), host::kErrWriteFailed);
        EXPECT_NE(std::string(error.what()).find("2 of 5 rows"),
                  std::string::npos)
            << error.what();
    }
    EXPECT_THROW(writer.Close(), std::logic_error); // closed by the failure
}

TEST(GeoTiffWriter, refuses_what_it_cannot_create) {
    rs2test::TempDir folder;
    const std::string missing = folder.File("no/such/folder/out.tif");
    try {
        host::GeoTiffWriter writer(missing, 4, 4, 1, host::SampleType::Int32);
        ADD_FAILURE() << "created " << missing;
    } catch (const host::Error &error) {
        EXPECT_EQ(error.Code(), host::kErrWriteFailed);
        EXPECT_EQ(std::string(error.what()).rfind(missing, 0), 0u)
            << error.what();
    }
    const std::pair<int32_t, int32_t> badSizes[] = {{0, 4}, {4, 0}, {-1, 4}};
    for (const auto &[width, height] : badSizes)
        EXPECT_THROW(host::GeoTiffWriter(folder.File("bad.tif"), width, height,
                                         1, host::SampleType::Int32),
                     std::invalid_argument)
            << width << " x " << height;
}

namespace {

// Runs in a child process: files may grow to 64 KiB, and the signal that
// would end the process at that limit is ignored, so writes fail. Exits 0
// when the writer reports the failure as a write failure.
[[noreturn]] void WriteBeyondFileSizeLimit(const std::string &path) {
    const rlimit limit{64 << 10, 64 << 10};
    setrlimit(RLIMIT_FSIZE, &limit);
    signal(SIGXFSZ, SIG_IGN);
    const std::vector<unsigned char> rows(512 * 4 * 512);
    try {
        host::GeoTiffWriter writer(path, 512, 512, 1,
                                   host::SampleType::Float32);
        writer.WriteRows(0, 512, rows.data());
        writer.Close();
    } catch (const host::Error &error) {
        std::fprintf(stderr, "%s\n", error.what());
        _exit(error.Code() == host::kErrWriteFailed ? 0 : 2);
    }
    _exit(1);
}

} // namespace

TEST(GeoTiffWriter, a_failing_disk_is_reported_not_ignored) {
    rs2test::TempDir folder;
    EXPECT_EXIT(WriteBeyondFileSizeLimit(folder.File("full.tif")),
                ::testing::ExitedWithCode(0), "full.tif");
}

TEST(GeoTiffWriter, becomes_a_bigtiff_only_beyond_4_gib) {
    struct Case {
        int32_t width, height;
        bool big;
    };
    // 8 bytes a pixel. A classic TIFF keeps 64 MiB of its 4 GiB for tags:
    // 16384 x 31744 pixels (62 rows of 512 x 512 tiles) fit beside them; one
    // more row takes a 63rd row of tiles, which does not.
    const Case cases[] = {
        {1000, 1000, false}, {16384, 31744, false}, {16384, 31745, true}};
    rs2test::TempDir folder;
    for (const Case &c : cases) {
        const std::string path = folder.File("big.tif");
        {
            host::GeoTiffWriter writer(path, c.width, c.height, 1,
                                       host::SampleType::ComplexFloat32);
            EXPECT_EQ(writer.IsBigTiff(), c.big) << c.width << "x" << c.height;
        } // closed unfinished, without a row
        EXPECT_EQ(TiffVersion(path), c.big ? 43 : 42);
    }
}

namespace {

struct WrittenGeoreferencing {
    int modelType, rasterType, projected, geographic;
    std::vector<double> matrix, scale, ties;
};

WrittenGeoreferencing WriteAndReadBack(const std::string &path,
                                       const host::GeoTiffGeoreferencing &geo) {
    {
        host::GeoTiffWriter writer(path, 4, 3, 1, host::SampleType::Float32);
        writer.SetGeoreferencing(geo);
        const std::vector<float> rows(12, 1.0f);
        writer.WriteRows(0, 3, rows.data());
        writer.Close();
    }
    TiffKeeper tiff = OpenForReading(path);
    GtifKeeper gtif(tiff ? GTIFNew(tiff.get()) : nullptr);
    if (!gtif)
        return {};
    return {ShortKey(gtif.get(), GTModelTypeGeoKey),
            ShortKey(gtif.get(), GTRasterTypeGeoKey),
            ShortKey(gtif.get(), ProjectedCSTypeGeoKey),
            ShortKey(gtif.get(), GeographicTypeGeoKey),
            DoubleArray(tiff.get(), TIFFTAG_GEOTRANSMATRIX),
            DoubleArray(tiff.get(), TIFFTAG_GEOPIXELSCALE),
            DoubleArray(tiff.get(), TIFFTAG_GEOTIEPOINTS)};
}

} // namespace

TEST(GeoTiffWriter, writes_utm_and_geographic_georeferencing_as_pixel_is_area) {
    const std::array<double, 6> rotated = {500000.0,  11.5, -2.0,
                                           5450000.0, -1.5, -12.5};
    const std::array<double, 6> northUp = {300000.0,  10.0, 0.0,
                                           7000000.0, 0.0,  -10.0};
    const host::TiePoint tie{0.5, 0.5, -123.25, 49.5, 12.0};
    struct Case {
        host::GeoTiffGeoreferencing geo;
        int modelType, projected, geographic;
        std::vector<double> matrix, scale, ties;
    };
    // The 4 x 4 model transformation, row by row.
    const std::vector<double> rotatedMatrix = {
        11.5, -2.0, 0, 500000.0, -1.5, -12.5, 0, 5450000.0,
        0,    0,    0, 0,        0,    0,     0, 1};
    // clang-format off
    const Case cases[] = {
        // A rotated grid needs the matrix; its tie points follow it.
        {{"UTM 10 U D000", true, rotated, {{0.5, 0.5, 500010.0, 5449990.0, 3.0}}, {}},
         ModelTypeProjected, 32610, -1, rotatedMatrix, {}, {0.5, 0.5, 0, 500010.0, 5449990.0, 3.0}},
        // A north-up grid in the south: scale and one tie point.
        {{"UTM 33 H D000", true, northUp, {}, {}},
         ModelTypeProjected, 32733, -1, {}, {10.0, 10.0, 0.0}, {0, 0, 0, 300000.0, 7000000.0, 0}},
        // Tie points alone, in WGS 84 longitude and latitude.
        {{"LONG D000", false, {}, {tie}, {}},
         ModelTypeGeographic, -1, GCS_WGS_84, {}, {}, {0.5, 0.5, 0, -123.25, 49.5, 12.0}},
    };
    // clang-format on
    rs2test::TempDir folder;
    for (const Case &c : cases) {
        const WrittenGeoreferencing written =
            WriteAndReadBack(folder.File("geo.tif"), c.geo);
        EXPECT_EQ(written.modelType, c.modelType) << c.geo.geosys;
        EXPECT_EQ(written.rasterType, RasterPixelIsArea) << c.geo.geosys;
        EXPECT_EQ(written.projected, c.projected) << c.geo.geosys;
        EXPECT_EQ(written.geographic, c.geographic) << c.geo.geosys;
        EXPECT_EQ(written.matrix, c.matrix) << c.geo.geosys;
        EXPECT_EQ(written.scale, c.scale) << c.geo.geosys;
        EXPECT_EQ(written.ties, c.ties) << c.geo.geosys;
    }
}

TEST(GeoTiffWriter, the_host_reader_reads_back_what_it_wrote) {
    rs2test::TempDir folder;
    const std::string path = folder.File("loop.tif");
    host::GeoTiffGeoreferencing geo{
        "UTM 10 U D000",
        true,
        {500000.0, 11.5, -2.0, 5450000.0, -1.5, -12.5},
        {},
        {}};
    WriteAndReadBack(path, geo);
    host::Raster raster = host::OpenRaster(path);
    const ProjInfo_t projection = raster.Projection();
    EXPECT_STREQ(projection.geosys, "UTM 10 U D000");
    for (int i = 0; i < 6; ++i)
        EXPECT_NEAR(projection.transform[i], geo.transform[i], 1e-9) << i;
}

TEST(GeoTiffWriter, refuses_georeferencing_it_cannot_state) {
    const double nan = std::nan("");
    const host::GeoTiffGeoreferencing cases[] = {
        {"PIXEL", true, {0, 1, 0, 0, 0, -1}, {}, {}},        // no ground system
        {"METER", true, {0, 1, 0, 0, 0, -1}, {}, {}},        // no known datum
        {"UTM 10 U D000", true, {0, 1, 2, 0, 2, 4}, {}, {}}, // singular
        {"UTM 10 U D000", true, {nan, 1, 0, 0, 0, -1}, {}, {}},
        {"LONG D000", false, {}, {{0.5, 0.5, nan, 49.0, 0.0}}, {}},
        {"LONG D000", false, {}, {}, {}}, // nothing to state
        // An RPC model of another size than the tag's, or not finite.
        {"LONG D000", false, {}, {{0.5, 0.5, -123.0, 49.0, 0.0}}, {1.0, 2.0}},
        {"LONG D000",
         false,
         {},
         {{0.5, 0.5, -123.0, 49.0, 0.0}},
         std::vector<double>(host::kRpcTagValues, nan)},
    };
    rs2test::TempDir folder;
    for (const host::GeoTiffGeoreferencing &geo : cases) {
        host::GeoTiffWriter writer(folder.File("refused.tif"), 2, 2, 1,
                                   host::SampleType::Float32);
        EXPECT_THROW(writer.SetGeoreferencing(geo), std::invalid_argument)
            << geo.geosys;
    }
}

TEST(GeoTiffWriter, descriptions_become_the_gdal_metadata_and_nodata_tags) {
    constexpr ttag_t kMetadataTag = 42112;
    constexpr ttag_t kNoDataTag = 42113;
    struct Case {
        host::GeoTiffDescription description;
        std::string metadata, noData;
    };
    const Case cases[] = {
        // Image items, then each band's description and items; markup in
        // values is escaped.
        {{{{"UNITS", "dB"}, {"PRODUCT_ID", "a<b&\"c\">"}},
          {{"HH", {{"POLARIZATION", "HH"}}}, {"", {{"POLARIZATION", "HV"}}}},
          "nan"},
         "<GDALMetadata>\n"
         "  <Item name=\"UNITS\">dB</Item>\n"
         "  <Item name=\"PRODUCT_ID\">a&lt;b&amp;&quot;c&quot;&gt;</Item>\n"
         "  <Item name=\"DESCRIPTION\" sample=\"0\" "
         "role=\"description\">HH</Item>\n"
         "  <Item name=\"POLARIZATION\" sample=\"0\">HH</Item>\n"
         "  <Item name=\"POLARIZATION\" sample=\"1\">HV</Item>\n"
         "</GDALMetadata>\n",
         "nan"},
        // Nothing to say: neither tag.
        {{}, "", ""},
    };
    rs2test::TempDir folder;
    const std::vector<unsigned char> rows(2 * 4 * 3);
    for (const Case &c : cases) {
        const std::string path = folder.File("described.tif");
        {
            host::GeoTiffWriter writer(path, 3, 1, 2,
                                       host::SampleType::Float32);
            writer.SetDescription(c.description);
            writer.WriteRows(0, 1, rows.data());
            EXPECT_THROW(writer.SetDescription(c.description),
                         std::logic_error);
            writer.Close();
        }
        TiffKeeper tiff = OpenForReading(path);
        ASSERT_TRUE(tiff);
        EXPECT_EQ(rs2test::AsciiTag(tiff.get(), kMetadataTag), c.metadata);
        EXPECT_EQ(rs2test::AsciiTag(tiff.get(), kNoDataTag), c.noData);
    }
    host::GeoTiffWriter writer(folder.File("bands.tif"), 3, 1, 2,
                               host::SampleType::Float32);
    EXPECT_THROW(writer.SetDescription({{}, {{"HH", {}}}, ""}),
                 std::invalid_argument); // one band of two described
}
