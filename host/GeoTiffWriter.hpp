#pragma once

#include "host/Visibility.hpp"

#include "host/GeoTiffImage.hpp"

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace host {

/// Error code of a GeoTIFF that cannot be created or written.
constexpr int32_t kErrWriteFailed = 6;

/// The most tie points a file takes: ModelTiepointTag counts its values in
/// 16 bits, six values a point (one point more is the anchor of a north-up
/// transform).
constexpr size_t kMaxTiePoints = 65535 / 6 - 1;

/// Values of the GeoTIFF RPC tag: error bias and random error, the line,
/// sample, latitude, longitude and height offsets, the same five scales,
/// then the line numerator and denominator and the sample numerator and
/// denominator, 20 coefficients each.
constexpr size_t kRpcTagValues = 92;

/// What one channel of a written pixel holds.
enum class SampleType {
    Float32,        ///< one IEEE float
    ComplexFloat32, ///< in-phase and quadrature floats, one 64-bit sample
    Int32,          ///< one signed 32-bit integer
    /// in-phase and quadrature signed 16-bit integers, one 32-bit sample
    ComplexInt16,
};

/// How the tiles of a written image are compressed, all without loss.
enum class GeoTiffCompression { None, Deflate, Zstd, Lzw };

/// The name of a compression as options spell it ("none", "deflate",
/// "zstd", "lzw").
VXB_API const char *CompressionName(GeoTiffCompression compression);

/// Where a written image lies on the ground. The raster positions follow
/// the host's pixel-is-area convention (see ProjInfo_t): the file says
/// RasterPixelIsArea and takes transform and tie points as they are.
struct GeoTiffGeoreferencing {
    /// The model system of transform and tie points: "LONG D000" (WGS 84
    /// geographic, x longitude, y latitude) or "UTM zz B D000" (WGS 84 /
    /// UTM zone zz, north for bands N..X, south for C..M). Empty: the file
    /// gets no georeferencing.
    std::string geosys;
    bool hasTransform = false;
    /// GDAL order (upper-left x, x per column, x per line, upper-left y,
    /// y per column, y per line), used when hasTransform is set.
    std::array<double, 6> transform{};
    /// Ground control points in geosys. Without a transform they are the
    /// georeferencing; with one they travel beside it in the same system.
    std::vector<TiePoint> tiePoints;
    /// Empty, or the kRpcTagValues values of the GeoTIFF RPC tag
    /// (RPCCoefficientTag): an RPC model of the image, written beside the
    /// georeferencing.
    std::vector<double> rpcCoefficients;
};

/// What a written image says about itself to GIS readers: the items of the
/// GDAL metadata tag (42112) and the nodata value of the GDAL nodata tag
/// (42113).
struct GeoTiffDescription {
    /// Items of the whole image, name and value, written in this order.
    std::vector<std::pair<std::string, std::string>> items;
    /// Per channel (empty, or one entry a channel): its description, read by
    /// GIS software as the band's name, and its own items.
    struct Band {
        std::string description;
        std::vector<std::pair<std::string, std::string>> items;
    };
    std::vector<Band> bands;
    /// The value that marks "no data" ("nan", "0", ...); empty: none.
    std::string noData;
};

/// A new GeoTIFF of 512 x 512 tiles, uncompressed or compressed without
/// loss (integers with the horizontal predictor, real floats with the
/// floating-point one), written row band by row band: only one row of tiles
/// is held in memory, so a large image never has to be. It owns its libtiff and
/// libgeotiff handles; libtiff's messages go to a per-file handler and become
/// the reason of the failure they belong to, never printed. The file is a
/// BigTIFF when a classic TIFF could not address it. Pixels are
/// pixel-interleaved in native byte order.
///
/// A writer that fails, or is destroyed without a successful Close(), closes
/// its file as it stands: an unfinished image, which the caller removes.
class VXB_API GeoTiffWriter {
  public:
    /// Creates path (replacing a file there) for an image of width x height
    /// pixels of channels channels. Throws std::invalid_argument for sizes
    /// below 1 or a row too long to address, host::Error(kErrWriteFailed)
    /// naming the file when it cannot be created or libtiff lacks the codec.
    GeoTiffWriter(const std::string &path, int32_t width, int32_t height,
                  int32_t channels, SampleType type,
                  GeoTiffCompression compression = GeoTiffCompression::None);
    ~GeoTiffWriter();
    GeoTiffWriter(const GeoTiffWriter &) = delete;
    GeoTiffWriter &operator=(const GeoTiffWriter &) = delete;

    /// Bytes of one row of pixels, as WriteRows expects them.
    size_t RowBytes() const;
    /// Rows of a row of tiles: the writer holds them, cut into tiles, until
    /// the last of them comes, then writes the tiles.
    int32_t RowsPerTileRow() const;
    /// True when the file is a BigTIFF.
    bool IsBigTiff() const;

    /// Sets the georeferencing tags and keys, once, before the first row
    /// (else std::logic_error); an empty geosys sets nothing. Throws
    /// std::invalid_argument for an unknown system, a non-finite or singular
    /// transform, non-finite or too many tie points, neither transform nor
    /// tie points, or RPC values of another count or not finite.
    void SetGeoreferencing(const GeoTiffGeoreferencing &georeferencing);

    /// Sets the GDAL metadata and nodata tags, once, before the first row
    /// (else std::logic_error). Throws std::invalid_argument when bands is
    /// neither empty nor one entry a channel.
    void SetDescription(const GeoTiffDescription &description);

    /// Writes rowCount rows starting at firstRow from data (rowCount x
    /// RowBytes() bytes). Rows come in order: firstRow is the first row not
    /// yet written, else std::invalid_argument. Throws host::Error
    /// (kErrWriteFailed) with libtiff's reason when the file cannot be
    /// written; the writer is unusable afterwards.
    void WriteRows(int32_t firstRow, int32_t rowCount, const void *data);

    /// Writes the directory and closes the file. Throws
    /// host::Error(kErrWriteFailed) when rows are missing or the file cannot
    /// be finished or closed; the file is unfinished then. Closing twice is
    /// a std::logic_error.
    void Close();

  private:
    struct State;
    std::unique_ptr<State> state;
};

} // namespace host
