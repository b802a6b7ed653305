#include "host/TiffGeoreferencing.hpp"

#include "host/ModelSegments.hpp"

#include <geotiffio.h>
#include <geovalues.h>
#include <xtiffio.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <optional>

namespace host {
namespace {

// ModelTiepointTag holds (I, J, K, X, Y, Z) per point.
constexpr size_t kTiePointValues = 6;
// ModelTransformationTag is a 4 x 4 matrix, row by row.
constexpr size_t kMatrixValues = 16;
// WGS 84 / UTM zone 1N is 32601, zone 60S is 32760.
constexpr int kUtmNorthBase = 32600;
constexpr int kUtmSouthBase = 32700;

using AffineTransform = std::array<double, 6>; // GDAL order
using ModelPoint = std::array<double, 2>;      // x, y in model units

struct GtifDeleter {
    void operator()(GTIF *gtif) const { GTIFFree(gtif); }
};

// A damaged key directory only means the keys are absent; libgeotiff's
// complaint about it is not worth more than that.
void IgnoreGeoTiffMessage(GTIF *, int, const char *, ...) {}

// The coordinate system the GeoTIFF keys name, among those the host knows.
struct KeySystem {
    enum class Kind { Unknown, Geographic, Utm };
    Kind kind = Kind::Unknown;
    int zone = 0;
    bool north = true;
    bool pixelIsPoint = false; // tie points name pixel centres, not corners
};

int ShortKey(GTIF *gtif, geokey_t key) {
    unsigned short value = 0;
    return GTIFKeyGetSHORT(gtif, key, &value, 0, 1) == 1 ? value : 0;
}

KeySystem ProjectedSystem(int pcs) {
    KeySystem system;
    if (pcs > kUtmNorthBase && pcs <= kUtmNorthBase + 60) {
        system.kind = KeySystem::Kind::Utm;
        system.zone = pcs - kUtmNorthBase;
    } else if (pcs > kUtmSouthBase && pcs <= kUtmSouthBase + 60) {
        system.kind = KeySystem::Kind::Utm;
        system.zone = pcs - kUtmSouthBase;
        system.north = false;
    }
    return system;
}

KeySystem ReadKeySystem(TIFF *tif) {
    std::unique_ptr<GTIF, GtifDeleter> gtif(
        GTIFNewEx(tif, IgnoreGeoTiffMessage, nullptr));
    if (!gtif)
        return {};
    KeySystem system;
    switch (ShortKey(gtif.get(), GTModelTypeGeoKey)) {
    case ModelTypeGeographic:
        if (ShortKey(gtif.get(), GeographicTypeGeoKey) == GCS_WGS_84 ||
            ShortKey(gtif.get(), GeogGeodeticDatumGeoKey) == Datum_WGS84)
            system.kind = KeySystem::Kind::Geographic;
        break;
    case ModelTypeProjected:
        system = ProjectedSystem(ShortKey(gtif.get(), ProjectedCSTypeGeoKey));
        break;
    default:
        break;
    }
    system.pixelIsPoint =
        ShortKey(gtif.get(), GTRasterTypeGeoKey) == RasterPixelIsPoint;
    return system;
}

bool AllFinite(const std::vector<double> &values) {
    for (double value : values)
        if (!std::isfinite(value))
            return false;
    return true;
}

std::vector<TiePoint> ToTiePoints(const std::vector<double> &values) {
    std::vector<TiePoint> points;
    for (size_t i = 0; i + kTiePointValues <= values.size();
         i += kTiePointValues)
        points.push_back({values[i], values[i + 1], values[i + 3],
                          values[i + 4], values[i + 5]});
    return points;
}

// The transform from the transformation matrix, or from the pixel scale and
// the first tie point. Many tie points without a scale (as SAR products
// carry) describe a warped grid: no affine transform then.
std::optional<AffineTransform>
ReadAffineTransform(const TiffFile &file, const std::vector<TiePoint> &ties) {
    std::vector<double> matrix = file.DoubleArrayField(TIFFTAG_GEOTRANSMATRIX);
    std::vector<double> scale = file.DoubleArrayField(TIFFTAG_GEOPIXELSCALE);
    AffineTransform transform;
    if (matrix.size() >= kMatrixValues)
        transform = {matrix[3], matrix[0], matrix[1],
                     matrix[7], matrix[4], matrix[5]};
    else if (scale.size() >= 2 && !ties.empty())
        transform = {ties[0].x - ties[0].pixel * scale[0], scale[0], 0.0,
                     ties[0].y + ties[0].line * scale[1],  0.0,      -scale[1]};
    else
        return std::nullopt;
    const double determinant =
        transform[1] * transform[5] - transform[2] * transform[4];
    if (!AllFinite({transform.begin(), transform.end()}) || determinant == 0.0)
        return std::nullopt;
    return transform;
}

// The host's transforms place the upper-left corner of the first pixel; a
// pixel-is-point file ties pixel centres, half a pixel further in.
void MoveToPixelCorner(AffineTransform &transform) {
    transform[0] -= 0.5 * (transform[1] + transform[2]);
    transform[3] -= 0.5 * (transform[4] + transform[5]);
}

// "UTM <zone> <band> D000". Zones of the keys run 1-60, so the text fits a
// host coordinate-system text; the buffer still takes any int, so that no
// zone can cut the text short.
std::string UtmGeosys(int zone, char band) {
    char text[sizeof "UTM -2147483648 X D000"];
    std::snprintf(text, sizeof text, "UTM %d %c D000", zone, band);
    return text;
}

bool IsUtmBandLetter(char band) {
    return band >= 'C' && band <= 'X' && band != 'I' && band != 'O';
}

// The latitude band of a UTM point. Bands from N northwards are northern;
// when the point falls outside the hemisphere the keys name (or cannot be
// converted) the band is 'N' for north and 'M' for south, so that the text
// keeps the hemisphere, and with it the false northing, of the file.
char UtmBand(const KeySystem &system, const std::optional<ModelPoint> &point) {
    const char hemisphereBand = system.north ? 'N' : 'M';
    if (!point)
        return hemisphereBand;
    const std::string source = UtmGeosys(system.zone, hemisphereBand);
    double longitude = 0.0;
    double latitude = 0.0;
    if (GCTPSimpleTransform(source.c_str(), (*point)[0], (*point)[1],
                            "LONG D000", &longitude, &latitude) != 0)
        return hemisphereBand;
    int32_t zone = 0;
    char band = '\0';
    UTMZone(longitude, latitude, &zone, &band);
    if (!IsUtmBandLetter(band) || (band >= 'N') != system.north)
        return hemisphereBand;
    return band;
}

// Where the band of a UTM file is judged: the image centre, or the mean of
// the tie points when there is no affine transform; nowhere without either.
std::optional<ModelPoint>
ModelCentre(const std::optional<AffineTransform> &transform,
            const std::vector<TiePoint> &ties, int32_t width, int32_t height) {
    if (transform) {
        const AffineTransform &t = *transform;
        const double column = 0.5 * width;
        const double line = 0.5 * height;
        return ModelPoint{t[0] + column * t[1] + line * t[2],
                          t[3] + column * t[4] + line * t[5]};
    }
    if (ties.empty())
        return std::nullopt;
    ModelPoint mean{0.0, 0.0};
    for (const TiePoint &tie : ties) {
        mean[0] += tie.x / ties.size();
        mean[1] += tie.y / ties.size();
    }
    return mean;
}

std::string GeosysText(const KeySystem &system,
                       const std::optional<ModelPoint> &centre) {
    switch (system.kind) {
    case KeySystem::Kind::Geographic:
        return "LONG D000";
    case KeySystem::Kind::Utm:
        return UtmGeosys(system.zone, UtmBand(system, centre));
    default:
        return "PIXEL";
    }
}

// RPCCoefficientTag: ERR_BIAS, ERR_RAND (not kept: an RF record has no
// accuracy fields), then the offsets and scales below, then 20 coefficients
// each of LINE_NUM, LINE_DEN, SAMP_NUM, SAMP_DEN.
constexpr size_t kRpcValueCount = 92;
constexpr size_t kRpcFirstScale = 7;
constexpr size_t kRpcFirstCoefficient = 12;
struct RpcScalar {
    size_t index;
    double RFInfo_t::*field;
};
constexpr RpcScalar kRpcScalars[] = {
    {2, &RFInfo_t::lineOffset},      {3, &RFInfo_t::pixelOffset},
    {4, &RFInfo_t::latitudeOffset},  {5, &RFInfo_t::longitudeOffset},
    {6, &RFInfo_t::heightOffset},    {7, &RFInfo_t::lineScale},
    {8, &RFInfo_t::pixelScale},      {9, &RFInfo_t::latitudeScale},
    {10, &RFInfo_t::longitudeScale}, {11, &RFInfo_t::heightScale},
};
constexpr double *RFInfo_t::*kRpcPolynomials[] = {
    &RFInfo_t::lineNumeratorCoefficients,
    &RFInfo_t::lineDenominatorCoefficients,
    &RFInfo_t::pixelNumeratorCoefficients,
    &RFInfo_t::pixelDenominatorCoefficients,
};

struct RecordDeleter {
    void operator()(RFInfo_t *record) const { RFDeallocate(record); }
};
struct FreeDeleter {
    void operator()(unsigned char *block) const { std::free(block); }
};

bool IsWellFormedRpc(const std::vector<double> &values) {
    if (values.size() != kRpcValueCount || !AllFinite(values))
        return false;
    for (size_t i = kRpcFirstScale; i < kRpcFirstCoefficient; ++i)
        if (values[i] == 0.0)
            return false;
    return true;
}

std::vector<unsigned char> ReadRpcBlock(const TiffFile &file,
                                        const ProjInfo_t &projection,
                                        int32_t width, int32_t height) {
    const std::vector<double> values =
        file.DoubleArrayField(kRpcCoefficientTag);
    if (!IsWellFormedRpc(values))
        return {};
    std::unique_ptr<RFInfo_t, RecordDeleter> record(
        RFAllocate(nullptr, kRFBlockCoefficients));
    if (!record)
        return {};
    record->width = width;
    record->height = height;
    for (const RpcScalar &scalar : kRpcScalars)
        record.get()->*scalar.field = values[scalar.index];
    const double *coefficients = values.data() + kRpcFirstCoefficient;
    for (double *RFInfo_t::*polynomial : kRpcPolynomials) {
        std::copy(coefficients, coefficients + kRFBlockCoefficients,
                  record.get()->*polynomial);
        coefficients += kRFBlockCoefficients;
    }
    *record->projection = projection;
    int32_t length = 0;
    std::unique_ptr<unsigned char, FreeDeleter> block(
        VXBRFInfoToBinary(record.get(), &length));
    if (!block)
        return {};
    return std::vector<unsigned char>(block.get(), block.get() + length);
}

} // namespace

TiffGeoreferencing ReadTiffGeoreferencing(const TiffFile &file, int32_t width,
                                          int32_t height) {
    TiffGeoreferencing result;
    const KeySystem system = ReadKeySystem(file.Handle());
    result.tiePoints = ToTiePoints(file.DoubleArrayField(TIFFTAG_GEOTIEPOINTS));
    std::optional<AffineTransform> transform =
        ReadAffineTransform(file, result.tiePoints);
    if (transform && system.pixelIsPoint)
        MoveToPixelCorner(*transform);
    result.tiePointGeosys = GeosysText(
        system, ModelCentre(transform, result.tiePoints, width, height));
    InitProjInfo(&result.projection, 0);
    if (transform && system.kind != KeySystem::Kind::Unknown) {
        const AffineTransform &t = *transform;
        Geosys2ProjInfo2(&result.projection, result.tiePointGeosys.c_str(),
                         t[0], t[3], t[1], t[5], t[2], t[4]);
    }
    result.rpcBlock = ReadRpcBlock(file, result.projection, width, height);
    return result;
}

} // namespace host
