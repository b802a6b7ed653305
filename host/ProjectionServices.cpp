#include "host/ProjectionServices.hpp"

#include <Eigen/Dense>
#include <proj.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <string>
#include <utility>

namespace {

constexpr int kUtmZoneParm = 0;
constexpr int kUtmHemisphereParm = 1;

// Bands C to M lie south of the equator, N to X north of it.
bool IsSouthernBand(char band) { return band < 'N'; }

struct UtmSystem {
    int zone = 0;
    char band = 'N';
};

// The zone and band of a normalised "UTM <zone> <band> D000" text.
bool ParseUtm(const char *normalised, UtmSystem *system) {
    int zone = 0;
    char band = '\0';
    if (std::sscanf(normalised, "UTM %d %c", &zone, &band) != 2)
        return false;
    system->zone = zone;
    system->band = band;
    return true;
}

// Writes the normalised text of geosys and the parameters its code needs;
// every other parameter is zero.
void SetGeosysAndParms(ProjInfo_t *record, const char *geosys) {
    const int32_t code = DecodeGeosys(geosys, record->geosys);
    std::fill(std::begin(record->parms), std::end(record->parms), 0.0);
    UtmSystem utm;
    if (code == kGeosysUTM && ParseUtm(record->geosys, &utm)) {
        record->parms[kUtmZoneParm] = utm.zone;
        record->parms[kUtmHemisphereParm] = IsSouthernBand(utm.band) ? -1 : 1;
    }
}

constexpr char kBandLetters[] = "CDEFGHJKLMNPQRSTUVWX";
constexpr double kLowestBandLatitude = -80.0;
constexpr double kBandHeight = 8.0;
constexpr int kBandCount = sizeof kBandLetters - 1;

// Band X spans 72..84 N (12 degrees); beyond the bands the nearest one is
// given, as polar areas have no UTM band of their own.
char LatitudeBand(double latitude) {
    const double index =
        std::floor((latitude - kLowestBandLatitude) / kBandHeight);
    const double clamped = std::clamp(index, 0.0, kBandCount - 1.0);
    return kBandLetters[static_cast<int>(clamped)];
}

// The standard zone of a longitude already in [-180, 180).
int StandardZone(double longitude) {
    const int zone =
        static_cast<int>(std::floor((longitude + 180.0) / 6.0)) + 1;
    return std::clamp(zone, 1, 60);
}

// Zone 32 is widened over south-western Norway, and Svalbard uses only the
// odd zones 31 to 37.
int ExceptionalZone(double longitude, double latitude, int zone) {
    if (latitude >= 56.0 && latitude < 64.0 && longitude >= 3.0 &&
        longitude < 12.0)
        return 32;
    if (latitude >= 72.0 && latitude < 84.0 && longitude >= 0.0 &&
        longitude < 42.0) {
        if (longitude < 9.0)
            return 31;
        if (longitude < 21.0)
            return 33;
        if (longitude < 33.0)
            return 35;
        return 37;
    }
    return zone;
}

double WrappedLongitude(double longitude) {
    double wrapped = std::fmod(longitude + 180.0, 360.0);
    if (wrapped < 0.0)
        wrapped += 360.0;
    return wrapped - 180.0;
}

struct ContextDeleter {
    void operator()(PJ_CONTEXT *context) const {
        proj_context_destroy(context);
    }
};
struct TransformDeleter {
    void operator()(PJ *transform) const { proj_destroy(transform); }
};
using TransformOwner = std::unique_ptr<PJ, TransformDeleter>;

// The EPSG name of a coordinate system PROJ can carry, or "" for the systems
// without a ground meaning (PIXEL, METER) and unknown texts.
std::string DecodedEpsgName(const char *geosys) {
    char normalised[kGeosysTextSize];
    const int32_t code = DecodeGeosys(geosys, normalised);
    if (code == kGeosysLong)
        return "EPSG:4326";
    UtmSystem utm;
    if (code == kGeosysUTM && ParseUtm(normalised, &utm)) {
        const int base = IsSouthernBand(utm.band) ? 32700 : 32600;
        return "EPSG:" + std::to_string(base + utm.zone);
    }
    return "";
}

// The same, remembered for the last two texts of this thread: a caller
// transforms point after point between the same two systems, and decoding
// the texts costs more than transforming a point.
std::string EpsgName(const char *geosys) {
    struct Decoded {
        std::string text;
        std::string name;
    };
    thread_local std::array<Decoded, 2> recent;
    thread_local size_t next = 0;
    const char *text = geosys != nullptr ? geosys : "";
    for (const Decoded &entry : recent)
        if (!entry.name.empty() && entry.text == text)
            return entry.name;
    Decoded &entry = recent[next];
    next = (next + 1) % recent.size();
    entry = {text, DecodedEpsgName(geosys)};
    return entry.name;
}

// The transformations between pairs of systems, built once per thread in a
// private PROJ context. x is always longitude or easting.
class TransformCache {
  public:
    TransformCache() : context(proj_context_create()) {
        if (context)
            proj_log_level(context.get(), PJ_LOG_NONE);
    }

    // The transformation from source to destination, or null when PROJ
    // cannot build one. Owned by the cache.
    PJ *Find(const std::string &source, const std::string &destination) {
        if (!context)
            return nullptr;
        const auto key = std::make_pair(source, destination);
        auto found = transforms.find(key);
        if (found != transforms.end())
            return found->second.get();
        TransformOwner created = Create(source, destination);
        if (!created)
            return nullptr;
        // A product touches one or two zones; the bound only guards a long
        // running program that wanders over the whole globe.
        if (transforms.size() >= kMaxTransforms)
            transforms.clear();
        return transforms.emplace(key, std::move(created)).first->second.get();
    }

  private:
    static constexpr size_t kMaxTransforms = 64;

    TransformOwner Create(const std::string &source,
                          const std::string &destination) {
        TransformOwner raw(proj_create_crs_to_crs(
            context.get(), source.c_str(), destination.c_str(), nullptr));
        if (!raw)
            return nullptr;
        return TransformOwner(
            proj_normalize_for_visualization(context.get(), raw.get()));
    }

    // Declared first so that it outlives the transformations made in it.
    std::unique_ptr<PJ_CONTEXT, ContextDeleter> context;
    std::map<std::pair<std::string, std::string>, TransformOwner> transforms;
};

TransformCache &ThreadTransforms() {
    thread_local TransformCache cache;
    return cache;
}

int TermCount(int order) { return (order + 1) * (order + 2) / 2; }

// The highest degree not above the request (and the record's room) whose
// term count the points can determine.
int SupportedOrder(int requested, int32_t count) {
    int order = std::clamp(requested, 0, kGeoMaxOrder);
    while (order > 0 && TermCount(order) > count)
        --order;
    return order;
}

// Monomials of total degree <= order in the order 1, u, v, u^2, uv, v^2,
// u^3, ...
void Monomials(int order, double u, double v, double *terms) {
    int next = 0;
    for (int degree = 0; degree <= order; ++degree)
        for (int vPower = 0; vPower <= degree; ++vPower)
            terms[next++] = std::pow(u, degree - vPower) * std::pow(v, vPower);
}

struct Normalisation {
    double centre = 0.0;
    double scale = 1.0;
};

// Centred on the mean and scaled to [-1, 1], so that high powers stay well
// conditioned for image coordinates in the tens of thousands.
Normalisation NormalisationOf(const double *values, int32_t count) {
    Normalisation result;
    double sum = 0.0;
    for (int32_t i = 0; i < count; ++i)
        sum += values[i];
    result.centre = sum / count;
    double spread = 0.0;
    for (int32_t i = 0; i < count; ++i)
        spread = std::max(spread, std::fabs(values[i] - result.centre));
    result.scale = spread > 0.0 ? spread : 1.0;
    return result;
}

bool AllFinite(const double *values, int32_t count) {
    return std::all_of(values, values + count,
                       [](double value) { return std::isfinite(value); });
}

double RootMeanSquare(const Eigen::VectorXd &residuals) {
    return std::sqrt(residuals.squaredNorm() / residuals.size());
}

} // namespace

void Geosys2ProjInfo(ProjInfo_t *record, const char *geosys, double ulx,
                     double uly, double xStepPerColumn, double yStepPerLine) {
    Geosys2ProjInfo2(record, geosys, ulx, uly, xStepPerColumn, yStepPerLine,
                     0.0, 0.0);
}

void Geosys2ProjInfo2(ProjInfo_t *record, const char *geosys, double ulx,
                      double uly, double xStepPerColumn, double yStepPerLine,
                      double xStepPerLine, double yStepPerColumn) {
    if (record == nullptr)
        return;
    SetGeosysAndParms(record, geosys ? geosys : "");
    record->transform[0] = ulx;
    record->transform[1] = xStepPerColumn;
    record->transform[2] = xStepPerLine;
    record->transform[3] = uly;
    record->transform[4] = yStepPerColumn;
    record->transform[5] = yStepPerLine;
}

char *ProjInfo2Parms(const ProjInfo_t *record) {
    if (record == nullptr)
        return nullptr;
    std::string text;
    char number[32];
    for (int i = 0; i < kProjParmCount; ++i) {
        std::snprintf(number, sizeof number, "%.17g", record->parms[i]);
        if (i > 0)
            text += ' ';
        text += number;
    }
    char *result = static_cast<char *>(std::malloc(text.size() + 1));
    if (result != nullptr)
        std::memcpy(result, text.c_str(), text.size() + 1);
    return result;
}

void ProjParms2Info(const char *parms, ProjInfo_t *record) {
    if (parms == nullptr || record == nullptr)
        return;
    const char *cursor = parms;
    for (int i = 0; i < kProjParmCount; ++i) {
        char *end = nullptr;
        const double value = std::strtod(cursor, &end);
        // Parameters the text does not give (or garbles) read as zero, so
        // the record holds exactly what the text says.
        if (end == cursor) {
            std::fill(record->parms + i, record->parms + kProjParmCount, 0.0);
            return;
        }
        record->parms[i] = value;
        cursor = end;
    }
}

void UTMZone(double longitude, double latitude, int32_t *zone, char *band) {
    int32_t foundZone = 0;
    char foundBand = '\0';
    if (std::isfinite(longitude) && std::isfinite(latitude)) {
        const double wrapped = WrappedLongitude(longitude);
        foundZone = ExceptionalZone(wrapped, latitude, StandardZone(wrapped));
        foundBand = LatitudeBand(latitude);
    }
    if (zone != nullptr)
        *zone = foundZone;
    if (band != nullptr)
        *band = foundBand;
}

int32_t GCTPSimpleTransform(const char *srcGeosys, double x, double y,
                            const char *dstGeosys, double *outX, double *outY) {
    if (outX == nullptr || outY == nullptr)
        return 1;
    const std::string source = EpsgName(srcGeosys);
    const std::string destination = EpsgName(dstGeosys);
    if (source.empty() || destination.empty())
        return 1;
    if (source == destination) {
        *outX = x;
        *outY = y;
        return 0;
    }
    PJ *transform = ThreadTransforms().Find(source, destination);
    if (transform == nullptr)
        return 1;
    proj_errno_reset(transform);
    const PJ_COORD result =
        proj_trans(transform, PJ_FWD, proj_coord(x, y, 0.0, 0.0));
    if (proj_errno(transform) != 0 || !std::isfinite(result.xy.x) ||
        !std::isfinite(result.xy.y))
        return 1;
    *outX = result.xy.x;
    *outY = result.xy.y;
    return 0;
}

int32_t GCPRegression2(GEOInfo_t *geo, const char *srcGeosys,
                       const double *srcX, const double *srcY,
                       const char *dstGeosys, const double *dstX,
                       const double *dstY, int32_t count, int32_t *order,
                       int32_t, double *rmsX, double *rmsY) {
    if (geo == nullptr || count <= 0 || !srcX || !srcY || !dstX || !dstY)
        return 1;
    if (!AllFinite(srcX, count) || !AllFinite(srcY, count) ||
        !AllFinite(dstX, count) || !AllFinite(dstY, count))
        return 1;
    const int fitted = SupportedOrder(order ? *order : kGeoMaxOrder, count);
    const int terms = TermCount(fitted);
    const Normalisation u = NormalisationOf(srcX, count);
    const Normalisation v = NormalisationOf(srcY, count);

    Eigen::MatrixXd design(count, terms);
    Eigen::VectorXd targetX(count);
    Eigen::VectorXd targetY(count);
    double row[kGeoMaxTerms];
    for (int32_t i = 0; i < count; ++i) {
        Monomials(fitted, (srcX[i] - u.centre) / u.scale,
                  (srcY[i] - v.centre) / v.scale, row);
        for (int k = 0; k < terms; ++k)
            design(i, k) = row[k];
        targetX(i) = dstX[i];
        targetY(i) = dstY[i];
    }
    // Column pivoting keeps a rank-deficient grid (all tie points on one
    // line, say) solvable: the undetermined terms come out zero.
    const Eigen::ColPivHouseholderQR<Eigen::MatrixXd> solver(design);
    const Eigen::VectorXd coefficientsX = solver.solve(targetX);
    const Eigen::VectorXd coefficientsY = solver.solve(targetY);
    if (!coefficientsX.allFinite() || !coefficientsY.allFinite())
        return 1;

    *geo = GEOInfo_t{};
    DecodeGeosys(srcGeosys, geo->srcGeosys);
    DecodeGeosys(dstGeosys, geo->dstGeosys);
    geo->order = fitted;
    geo->termCount = terms;
    geo->srcCentre[0] = u.centre;
    geo->srcCentre[1] = v.centre;
    geo->srcScale[0] = u.scale;
    geo->srcScale[1] = v.scale;
    for (int k = 0; k < terms; ++k) {
        geo->xCoefficients[k] = coefficientsX(k);
        geo->yCoefficients[k] = coefficientsY(k);
    }
    if (order != nullptr)
        *order = fitted;
    if (rmsX != nullptr)
        *rmsX = RootMeanSquare(design * coefficientsX - targetX);
    if (rmsY != nullptr)
        *rmsY = RootMeanSquare(design * coefficientsY - targetY);
    return 0;
}

void GCPTransform(const GEOInfo_t *geo, double x, double y, double *outX,
                  double *outY) {
    if (geo == nullptr || geo->order < 0 || geo->order > kGeoMaxOrder ||
        geo->termCount != TermCount(geo->order) || geo->srcScale[0] == 0.0 ||
        geo->srcScale[1] == 0.0)
        return;
    double terms[kGeoMaxTerms];
    Monomials(geo->order, (x - geo->srcCentre[0]) / geo->srcScale[0],
              (y - geo->srcCentre[1]) / geo->srcScale[1], terms);
    double sumX = 0.0;
    double sumY = 0.0;
    for (int k = 0; k < geo->termCount; ++k) {
        sumX += geo->xCoefficients[k] * terms[k];
        sumY += geo->yCoefficients[k] * terms[k];
    }
    if (outX != nullptr)
        *outX = sumX;
    if (outY != nullptr)
        *outY = sumY;
}
