#include "host/GeoTiffWriter.hpp"

#include "host/GdalMetadata.hpp"

#include "host/ProjectionServices.hpp"
#include "host/Raster.hpp"

#include <geotiffio.h>
#include <geovalues.h>
#include <tiffio.h>
#include <xtiffio.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <limits>
#include <stdexcept>
#include <unistd.h>

namespace host {
namespace {

// Square tiles of this many pixels a side: GIS software reads any part of
// the image, or an overview of it, without decoding whole rows, and 512 is
// the size most of it uses itself.
constexpr int32_t kTileSize = 512;
// A classic TIFF addresses 4 GiB; what the tags and the tile tables take
// beyond the pixels stays far below this margin.
constexpr uint64_t kClassicTiffLimit = 0xFFFFFFFFull;
constexpr uint64_t kTagMargin = uint64_t{64} << 20;
// WGS 84 / UTM zone 1N is 32601, zone 1S is 32701.
constexpr int kUtmNorthBase = 32600;
constexpr int kUtmSouthBase = 32700;
// RPCCoefficientTag, where GeoTIFF readers look for an RPC model.
constexpr ttag_t kRpcCoefficientTag = 50844;
// Where GIS readers look for an image's own metadata and its nodata value.
constexpr ttag_t kGdalMetadataTag = 42112;
constexpr ttag_t kGdalNoDataTag = 42113;
// Rows longer than this are refused: a row of tiles, which the writer
// assembles in memory, holds kTileSize of them (at most 2 GiB then).
constexpr size_t kMaxRowBytes = size_t{4} << 20;

struct SampleLayout {
    uint16_t bitsPerSample;
    uint16_t sampleFormat;
    int32_t samplesPerChannel;
};

SampleLayout LayoutOf(SampleType type) {
    switch (type) {
    case SampleType::Float32:
        return {32, SAMPLEFORMAT_IEEEFP, 1};
    case SampleType::ComplexFloat32:
        return {64, SAMPLEFORMAT_COMPLEXIEEEFP, 1};
    case SampleType::Int32:
        return {32, SAMPLEFORMAT_INT, 1};
    case SampleType::ComplexInt16:
        return {32, SAMPLEFORMAT_COMPLEXINT, 1};
    }
    throw std::invalid_argument("unknown sample type");
}

uint16_t CompressionScheme(GeoTiffCompression compression) {
    switch (compression) {
    case GeoTiffCompression::None:
        return COMPRESSION_NONE;
    case GeoTiffCompression::Deflate:
        return COMPRESSION_ADOBE_DEFLATE;
    case GeoTiffCompression::Zstd:
        return COMPRESSION_ZSTD;
    case GeoTiffCompression::Lzw:
        return COMPRESSION_LZW;
    }
    throw std::invalid_argument("unknown compression");
}

// Differences between neighbours compress better than the values: integers
// take the plain difference, floats libtiff's byte-plane difference, which
// it applies to real floats only, so complex floats go without.
uint16_t PredictorFor(SampleType type, GeoTiffCompression compression) {
    if (compression == GeoTiffCompression::None ||
        type == SampleType::ComplexFloat32)
        return PREDICTOR_NONE;
    return type == SampleType::Float32 ? PREDICTOR_FLOATINGPOINT
                                       : PREDICTOR_HORIZONTAL;
}

int KeepError(TIFF *, void *lastError, const char *module, const char *format,
              va_list args) {
    char text[1024];
    std::vsnprintf(text, sizeof text, format, args);
    auto &kept = *static_cast<std::string *>(lastError);
    kept = module != nullptr && *module != '\0'
               ? std::string(module) + ": " + text
               : std::string(text);
    return 1;
}

int DropWarning(TIFF *, void *, const char *, const char *, va_list) {
    return 1;
}

// libgeotiff reports through a printf-style callback without user data; the
// return values of its calls say all the writer needs.
void IgnoreGeoTiffMessage(GTIF *, int, const char *, ...) {}

struct OptionsDeleter {
    void operator()(TIFFOpenOptions *options) const {
        TIFFOpenOptionsFree(options);
    }
};

struct GtifDeleter {
    void operator()(GTIF *gtif) const { GTIFFree(gtif); }
};

// The model system of a host coordinate-system text.
struct ModelSystem {
    bool utm = false;
    int zone = 0;
    bool north = true;
};

ModelSystem ParseModelSystem(const std::string &geosys) {
    char normalised[kGeosysTextSize] = {};
    const int32_t code = DecodeGeosys(geosys.c_str(), normalised);
    if (code == kGeosysLong)
        return {};
    int zone = 0;
    char band = '\0';
    if (code != kGeosysUTM ||
        std::sscanf(normalised, "UTM %d %c", &zone, &band) != 2 || zone < 1 ||
        zone > 60)
        throw std::invalid_argument("cannot georeference a GeoTIFF in \"" +
                                    geosys + "\"");
    return {true, zone, band >= 'N'};
}

bool AllFinite(const double *values, size_t count) {
    return std::all_of(values, values + count,
                       [](double value) { return std::isfinite(value); });
}

void CheckGeoreferencing(const GeoTiffGeoreferencing &geo) {
    const auto &t = geo.transform;
    if (geo.hasTransform &&
        (!AllFinite(t.data(), t.size()) || t[1] * t[5] - t[2] * t[4] == 0.0))
        throw std::invalid_argument(
            "the affine transform is not finite or not invertible");
    for (const TiePoint &point : geo.tiePoints) {
        const double values[] = {point.pixel, point.line, point.x, point.y,
                                 point.z};
        if (!AllFinite(values, std::size(values)))
            throw std::invalid_argument("a tie point is not finite");
    }
    if (geo.tiePoints.size() > kMaxTiePoints)
        throw std::invalid_argument(
            "more than " + std::to_string(kMaxTiePoints) + " tie points");
    if (!geo.hasTransform && geo.tiePoints.empty())
        throw std::invalid_argument(
            "georeferencing needs a transform or tie points");
    const auto &rpc = geo.rpcCoefficients;
    if (!rpc.empty() &&
        (rpc.size() != kRpcTagValues || !AllFinite(rpc.data(), rpc.size())))
        throw std::invalid_argument("an RPC model takes " +
                                    std::to_string(kRpcTagValues) +
                                    " finite values");
}

// A north-up transform is said with the pixel scale and one tie point, the
// form every GeoTIFF reader knows; others need the transformation matrix.
bool IsNorthUp(const GeoTiffGeoreferencing &geo) {
    const auto &t = geo.transform;
    return t[2] == 0.0 && t[4] == 0.0 && t[1] > 0.0 && t[5] < 0.0;
}

std::string UtmCitation(const ModelSystem &system) {
    return "WGS 84 / UTM zone " + std::to_string(system.zone) +
           (system.north ? "N" : "S");
}

} // namespace

struct GeoTiffWriter::State {
    std::string path;
    int32_t width = 0;
    int32_t height = 0;
    int32_t channelCount = 0;
    size_t rowBytes = 0;
    size_t pixelBytes = 0;
    bool bigTiff = false;
    int32_t nextRow = 0;      // first row of the row of tiles being assembled
    int32_t bufferedRows = 0; // rows of it held in tiles
    // The row of tiles being assembled, tile after tile, each as libtiff
    // encodes it.
    std::vector<unsigned char> tiles;
    bool georeferenced = false;
    bool described = false;
    bool failed = false;
    // libtiff's latest error on this file, at a fixed address that outlives
    // the handle pointing to it.
    std::unique_ptr<std::string> lastError = std::make_unique<std::string>();
    TIFF *tiff = nullptr;

    ~State() { CloseFile(); }

    // Closes the file as it stands (libtiff writes out what it still holds:
    // an unfinished image stays unfinished). False when the system reports
    // that closing failed, errno telling why.
    bool CloseFile() noexcept {
        if (tiff == nullptr)
            return true;
        const int descriptor = TIFFFileno(tiff);
        TIFFCleanup(tiff);
        tiff = nullptr;
        return descriptor < 0 || ::close(descriptor) == 0;
    }

    [[noreturn]] void Fail(const std::string &what) {
        failed = true;
        std::string message = path + ": " + what;
        if (!lastError->empty())
            message += " (" + *lastError + ")";
        CloseFile();
        throw Error(kErrWriteFailed, message);
    }

    void RequireOpen() const {
        if (tiff == nullptr || failed)
            throw std::logic_error(path + ": the GeoTIFF writer is closed");
    }

    int32_t TileRowRows(int32_t firstRow) const {
        return std::min(kTileSize, height - firstRow);
    }

    size_t TileRowBytes() const { return pixelBytes * kTileSize; }
    size_t TileBytes() const { return TileRowBytes() * kTileSize; }

    // Copies count rows into the tiles of the row of tiles being assembled,
    // where they go on from row bufferedRows. What lies beyond the right edge
    // of the image stays zero.
    void Buffer(const unsigned char *rows, int32_t count) {
        const size_t tileRowBytes = TileRowBytes();
        const size_t across = (rowBytes + tileRowBytes - 1) / tileRowBytes;
        if (tiles.empty())
            tiles.resize(across * TileBytes());
        for (int32_t i = 0; i < count; ++i) {
            const unsigned char *row = rows + rowBytes * static_cast<size_t>(i);
            unsigned char *target =
                tiles.data() +
                tileRowBytes * static_cast<size_t>(bufferedRows + i);
            for (size_t t = 0; t < across; ++t)
                std::memcpy(
                    target + TileBytes() * t, row + tileRowBytes * t,
                    std::min(tileRowBytes, rowBytes - tileRowBytes * t));
        }
        bufferedRows += count;
    }

    // Writes the assembled row of tiles, which starts at image row firstRow.
    // The rows of the bottom tiles below the image become zero.
    void WriteTiles(int32_t firstRow) {
        const int32_t rows = TileRowRows(firstRow);
        const size_t count = tiles.size() / TileBytes();
        for (size_t t = 0; t < count; ++t) {
            unsigned char *tile = tiles.data() + TileBytes() * t;
            std::fill(tile + TileRowBytes() * static_cast<size_t>(rows),
                      tile + TileBytes(), 0);
            const uint32_t index =
                TIFFComputeTile(tiff, static_cast<uint32_t>(t * kTileSize),
                                static_cast<uint32_t>(firstRow), 0, 0);
            if (TIFFWriteEncodedTile(tiff, index, tile,
                                     static_cast<tmsize_t>(TileBytes())) < 0)
                Fail("cannot write rows " + std::to_string(firstRow) + " to " +
                     std::to_string(firstRow + rows - 1));
        }
    }

    void SetLayout(int32_t channels, SampleType type,
                   GeoTiffCompression compression) {
        const SampleLayout layout = LayoutOf(type);
        const auto samples =
            static_cast<uint16_t>(channels * layout.samplesPerChannel);
        bool set =
            TIFFSetField(tiff, TIFFTAG_IMAGEWIDTH, width) == 1 &&
            TIFFSetField(tiff, TIFFTAG_IMAGELENGTH, height) == 1 &&
            TIFFSetField(tiff, TIFFTAG_SAMPLESPERPIXEL, samples) == 1 &&
            TIFFSetField(tiff, TIFFTAG_BITSPERSAMPLE, layout.bitsPerSample) ==
                1 &&
            TIFFSetField(tiff, TIFFTAG_SAMPLEFORMAT, layout.sampleFormat) ==
                1 &&
            TIFFSetField(tiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) ==
                1 &&
            TIFFSetField(tiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK) ==
                1 &&
            TIFFSetField(tiff, TIFFTAG_TILEWIDTH, kTileSize) == 1 &&
            TIFFSetField(tiff, TIFFTAG_TILELENGTH, kTileSize) == 1;
        if (set && samples > 1) {
            // Beyond the grey sample, every sample is a plain value.
            std::vector<uint16_t> extra(samples - 1u, EXTRASAMPLE_UNSPECIFIED);
            set = TIFFSetField(tiff, TIFFTAG_EXTRASAMPLES,
                               static_cast<uint16_t>(extra.size()),
                               extra.data()) == 1;
        }
        if (!set)
            Fail("cannot set the image layout");
        SetCompression(type, compression);
    }

    void SetCompression(SampleType type, GeoTiffCompression compression) {
        const uint16_t scheme = CompressionScheme(compression);
        if (!TIFFIsCODECConfigured(scheme))
            Fail("this libtiff cannot compress with " +
                 std::string(CompressionName(compression)));
        const uint16_t predictor = PredictorFor(type, compression);
        if (TIFFSetField(tiff, TIFFTAG_COMPRESSION, scheme) != 1 ||
            (predictor != PREDICTOR_NONE &&
             TIFFSetField(tiff, TIFFTAG_PREDICTOR, predictor) != 1))
            Fail("cannot set the compression");
    }

    // libtiff knows no RPC tag: the handle learns it before it is set.
    void WriteRpcTag(const std::vector<double> &rpc) {
        if (rpc.empty())
            return;
        static const TIFFFieldInfo rpcField = {
            kRpcCoefficientTag,
            TIFF_VARIABLE,
            TIFF_VARIABLE,
            TIFF_DOUBLE,
            FIELD_CUSTOM,
            1,
            1,
            const_cast<char *>("RPCCoefficient")};
        if (TIFFMergeFieldInfo(tiff, &rpcField, 1) != 0 ||
            TIFFSetField(tiff, kRpcCoefficientTag, static_cast<int>(rpc.size()),
                         rpc.data()) != 1)
            Fail("cannot write the RPC tag");
    }

    // libtiff knows neither GDAL tag: the handle learns them before they are
    // set.
    void WriteAsciiTag(ttag_t tag, const char *name, const std::string &text) {
        if (text.empty())
            return;
        const TIFFFieldInfo field = {tag,
                                     TIFF_VARIABLE,
                                     TIFF_VARIABLE,
                                     TIFF_ASCII,
                                     FIELD_CUSTOM,
                                     1,
                                     0,
                                     const_cast<char *>(name)};
        if (TIFFMergeFieldInfo(tiff, &field, 1) != 0 ||
            TIFFSetField(tiff, tag, text.c_str()) != 1)
            Fail(std::string("cannot write the ") + name + " tag");
    }

    void WriteModelKeys(const ModelSystem &system) {
        std::unique_ptr<GTIF, GtifDeleter> keys(
            GTIFNewEx(tiff, IgnoreGeoTiffMessage, nullptr));
        if (!keys)
            Fail("cannot prepare the GeoTIFF keys");
        GTIF *gtif = keys.get();
        bool set = GTIFKeySet(gtif, GTRasterTypeGeoKey, TYPE_SHORT, 1,
                              RasterPixelIsArea) == 1;
        if (system.utm) {
            const int pcs =
                (system.north ? kUtmNorthBase : kUtmSouthBase) + system.zone;
            set = set &&
                  GTIFKeySet(gtif, GTModelTypeGeoKey, TYPE_SHORT, 1,
                             ModelTypeProjected) == 1 &&
                  GTIFKeySet(gtif, ProjectedCSTypeGeoKey, TYPE_SHORT, 1, pcs) ==
                      1 &&
                  GTIFKeySet(gtif, ProjLinearUnitsGeoKey, TYPE_SHORT, 1,
                             Linear_Meter) == 1 &&
                  GTIFKeySet(gtif, GTCitationGeoKey, TYPE_ASCII, 0,
                             UtmCitation(system).c_str()) == 1;
        } else {
            set = set &&
                  GTIFKeySet(gtif, GTModelTypeGeoKey, TYPE_SHORT, 1,
                             ModelTypeGeographic) == 1 &&
                  GTIFKeySet(gtif, GeographicTypeGeoKey, TYPE_SHORT, 1,
                             GCS_WGS_84) == 1 &&
                  GTIFKeySet(gtif, GeogAngularUnitsGeoKey, TYPE_SHORT, 1,
                             Angular_Degree) == 1 &&
                  GTIFKeySet(gtif, GeogCitationGeoKey, TYPE_ASCII, 0,
                             "WGS 84") == 1;
        }
        if (!set || GTIFWriteKeys(gtif) != 1)
            Fail("cannot write the GeoTIFF keys");
    }

    void WriteModelTags(const GeoTiffGeoreferencing &geo) {
        const auto &t = geo.transform;
        std::vector<double> ties;
        bool set = true;
        if (geo.hasTransform && geo.tiePoints.empty() && IsNorthUp(geo)) {
            const double scale[3] = {t[1], -t[5], 0.0};
            ties = {0.0, 0.0, 0.0, t[0], t[3], 0.0};
            set = TIFFSetField(tiff, TIFFTAG_GEOPIXELSCALE, 3, scale) == 1;
        } else if (geo.hasTransform) {
            const double matrix[16] = {t[1], t[2], 0.0, t[0], t[4], t[5],
                                       0.0,  t[3], 0.0, 0.0,  0.0,  0.0,
                                       0.0,  0.0,  0.0, 1.0};
            set = TIFFSetField(tiff, TIFFTAG_GEOTRANSMATRIX, 16, matrix) == 1;
        }
        for (const TiePoint &point : geo.tiePoints)
            ties.insert(ties.end(), {point.pixel, point.line, 0.0, point.x,
                                     point.y, point.z});
        if (set && !ties.empty())
            set = TIFFSetField(tiff, TIFFTAG_GEOTIEPOINTS,
                               static_cast<uint32_t>(ties.size()),
                               ties.data()) == 1;
        if (!set)
            Fail("cannot write the georeferencing tags");
    }
};

const char *CompressionName(GeoTiffCompression compression) {
    switch (compression) {
    case GeoTiffCompression::None:
        return "none";
    case GeoTiffCompression::Deflate:
        return "deflate";
    case GeoTiffCompression::Zstd:
        return "zstd";
    case GeoTiffCompression::Lzw:
        return "lzw";
    }
    return "";
}

GeoTiffWriter::GeoTiffWriter(const std::string &path, int32_t width,
                             int32_t height, int32_t channels, SampleType type,
                             GeoTiffCompression compression)
    : state(std::make_unique<State>()) {
    if (width < 1 || height < 1 || channels < 1)
        throw std::invalid_argument(
            path + ": a GeoTIFF needs at least one row, column and channel");
    const SampleLayout layout = LayoutOf(type);
    const size_t pixelBytes = static_cast<size_t>(channels) *
                              layout.samplesPerChannel *
                              (layout.bitsPerSample / 8u);
    if (pixelBytes > std::numeric_limits<uint16_t>::max() ||
        static_cast<size_t>(width) > kMaxRowBytes / pixelBytes)
        throw std::invalid_argument(path + ": rows of " +
                                    std::to_string(width) +
                                    " pixels are too long to write");
    State &s = *state;
    s.path = path;
    s.width = width;
    s.height = height;
    s.channelCount = channels;
    s.pixelBytes = pixelBytes;
    s.rowBytes = pixelBytes * static_cast<size_t>(width);
    // Tiles at the edges are whole tiles in the file.
    const auto tiles = [](int32_t pixels) {
        return static_cast<uint64_t>(pixels + kTileSize - 1) / kTileSize;
    };
    const uint64_t imageBytes =
        tiles(width) * tiles(height) * kTileSize * kTileSize * pixelBytes;
    s.bigTiff = imageBytes + kTagMargin > kClassicTiffLimit;

    // The GeoTIFF tags are known to libtiff only once libgeotiff has
    // registered them (once per process; later calls do nothing).
    XTIFFInitialize();
    std::unique_ptr<TIFFOpenOptions, OptionsDeleter> options(
        TIFFOpenOptionsAlloc());
    if (!options)
        s.Fail("cannot allocate libtiff options");
    TIFFOpenOptionsSetErrorHandlerExtR(options.get(), KeepError,
                                       s.lastError.get());
    TIFFOpenOptionsSetWarningHandlerExtR(options.get(), DropWarning, nullptr);
    s.tiff = TIFFOpenExt(path.c_str(), s.bigTiff ? "w8" : "w", options.get());
    if (s.tiff == nullptr)
        s.Fail("cannot create the file");
    s.SetLayout(channels, type, compression);
}

GeoTiffWriter::~GeoTiffWriter() = default;

size_t GeoTiffWriter::RowBytes() const { return state->rowBytes; }

int32_t GeoTiffWriter::RowsPerTileRow() const { return kTileSize; }

bool GeoTiffWriter::IsBigTiff() const { return state->bigTiff; }

void GeoTiffWriter::SetGeoreferencing(const GeoTiffGeoreferencing &geo) {
    State &s = *state;
    s.RequireOpen();
    if (s.georeferenced || s.nextRow > 0 || s.bufferedRows > 0)
        throw std::logic_error(
            s.path + ": georeferencing is set once, before the first row");
    if (geo.geosys.empty())
        return;
    const ModelSystem system = ParseModelSystem(geo.geosys);
    CheckGeoreferencing(geo);
    s.WriteModelTags(geo);
    s.WriteRpcTag(geo.rpcCoefficients);
    s.WriteModelKeys(system);
    s.georeferenced = true;
}

void GeoTiffWriter::SetDescription(const GeoTiffDescription &description) {
    State &s = *state;
    s.RequireOpen();
    if (s.described || s.nextRow > 0 || s.bufferedRows > 0)
        throw std::logic_error(
            s.path + ": the description is set once, before the first row");
    if (!description.bands.empty() &&
        description.bands.size() != static_cast<size_t>(s.channelCount))
        throw std::invalid_argument(
            s.path + ": " + std::to_string(description.bands.size()) +
            " band descriptions for " + std::to_string(s.channelCount) +
            " channel(s)");
    s.WriteAsciiTag(kGdalMetadataTag, "GDALMetadata",
                    GdalMetadataXml(description));
    s.WriteAsciiTag(kGdalNoDataTag, "GDALNoDataValue", description.noData);
    s.described = true;
}

void GeoTiffWriter::WriteRows(int32_t firstRow, int32_t rowCount,
                              const void *data) {
    State &s = *state;
    s.RequireOpen();
    const int32_t expected = s.nextRow + s.bufferedRows;
    if (firstRow != expected || rowCount < 0 ||
        rowCount > s.height - firstRow || (rowCount > 0 && data == nullptr))
        throw std::invalid_argument(
            s.path + ": rows " + std::to_string(firstRow) + " + " +
            std::to_string(rowCount) + " do not continue at row " +
            std::to_string(expected) + " of " + std::to_string(s.height));
    const auto *rows = static_cast<const unsigned char *>(data);
    int32_t remaining = rowCount;
    while (remaining > 0) {
        const int32_t tileRowRows = s.TileRowRows(s.nextRow);
        const int32_t take = std::min(remaining, tileRowRows - s.bufferedRows);
        s.Buffer(rows, take);
        if (s.bufferedRows == tileRowRows) {
            s.WriteTiles(s.nextRow);
            s.bufferedRows = 0;
            s.nextRow += tileRowRows;
        }
        rows += s.rowBytes * static_cast<size_t>(take);
        remaining -= take;
    }
}

void GeoTiffWriter::Close() {
    State &s = *state;
    s.RequireOpen();
    if (s.nextRow != s.height)
        s.Fail("only " + std::to_string(s.nextRow + s.bufferedRows) + " of " +
               std::to_string(s.height) + " rows were written");
    if (TIFFFlush(s.tiff) != 1 || !s.lastError->empty())
        s.Fail("cannot write the image directory");
    if (!s.CloseFile())
        throw Error(kErrWriteFailed, s.path + ": cannot close the file (" +
                                         std::strerror(errno) + ")");
}

} // namespace host
