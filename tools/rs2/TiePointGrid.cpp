#include "tools/rs2/TiePointGrid.hpp"

#include "host/ProjectionServices.hpp"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <limits>
#include <string>

namespace {

// The entry holds five numbers a point, each closed by ';': latitude,
// longitude, height, line, pixel.
constexpr size_t kFieldsPerPoint = 5;

// A field that is no number reads as NaN, so that its point is dropped.
// from_chars, as it needs no locale, reads a large grid several times faster
// than strtod.
std::vector<double> SemicolonFields(const std::string &text) {
    std::vector<double> fields;
    const char *start = text.data();
    const char *const stop = text.data() + text.size();
    for (const char *end = std::find(start, stop, ';'); end != stop;
         start = end + 1, end = std::find(start, stop, ';')) {
        double value = std::numeric_limits<double>::quiet_NaN();
        std::from_chars(start, end, value);
        fields.push_back(value);
    }
    return fields;
}

bool IsFinite(const GridTiePoint &point) {
    return std::isfinite(point.pixel) && std::isfinite(point.line) &&
           std::isfinite(point.longitude) && std::isfinite(point.latitude) &&
           std::isfinite(point.height);
}

} // namespace

std::vector<GridTiePoint> GeolocationGrid(const host::Entries &metadata) {
    std::vector<GridTiePoint> grid;
    for (const auto &[key, value] : metadata) {
        if (key != "GeolocationGrid")
            continue;
        const std::vector<double> fields = SemicolonFields(value);
        for (size_t i = 0; i + kFieldsPerPoint <= fields.size();
             i += kFieldsPerPoint) {
            // The product gives its tie points at pixel centres.
            const GridTiePoint point{fields[i + 4] + 0.5, fields[i + 3] + 0.5,
                                     fields[i + 1], fields[i], fields[i + 2]};
            if (IsFinite(point))
                grid.push_back(point);
        }
        break;
    }
    return grid;
}

double AffineMisfit::MaxMapDistance() const {
    return mapDistance.empty()
               ? 0.0
               : *std::max_element(mapDistance.begin(), mapDistance.end());
}

double AffineMisfit::RmsMapDistance() const {
    double sum = 0.0;
    for (double distance : mapDistance)
        sum += distance * distance;
    return mapDistance.empty() ? 0.0 : std::sqrt(sum / mapDistance.size());
}

AffineMisfit MeasureAffineMisfit(const ProjInfo_t &projection,
                                 const std::vector<GridTiePoint> &grid) {
    AffineMisfit misfit;
    const double *t = projection.transform;
    const double determinant = t[1] * t[5] - t[2] * t[4];
    if (determinant == 0.0 || !std::isfinite(determinant))
        return misfit;
    for (const GridTiePoint &point : grid) {
        double x = 0.0, y = 0.0;
        if (GCTPSimpleTransform("LONG D000", point.longitude, point.latitude,
                                projection.geosys, &x, &y) != 0 ||
            !std::isfinite(x) || !std::isfinite(y))
            continue;
        const double dx = x - (t[0] + point.pixel * t[1] + point.line * t[2]);
        const double dy = y - (t[3] + point.pixel * t[4] + point.line * t[5]);
        misfit.mapDistance.push_back(std::hypot(dx, dy));
        // The inverse of the transform's linear part turns the map offset
        // into columns and lines.
        misfit.pixelOffset.push_back({(t[5] * dx - t[2] * dy) / determinant,
                                      (t[1] * dy - t[4] * dx) / determinant});
    }
    return misfit;
}
