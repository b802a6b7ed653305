#include "tools/rs2/ExportGeoreferencing.hpp"

#include "host/RasterServices.hpp"

#include <array>
#include <cmath>
#include <string>
#include <vector>

namespace {

// The transform of the output grid: its origin at the window's corner, its
// steps scaled by the resampling and the looks (pixel-is-area positions, see
// ProjInfo_t).
std::array<double, 6> WindowTransform(const double *t, const ExportPlan &plan) {
    const double x = plan.window.x;
    const double y = plan.window.y;
    const double columnScale = plan.ColumnStep();
    const double lineScale = plan.LineStep();
    return {t[0] + x * t[1] + y * t[2], t[1] * columnScale, t[2] * lineScale,
            t[3] + x * t[4] + y * t[5], t[4] * columnScale, t[5] * lineScale};
}

// The dataset's ground control points in the file's system, at their
// positions in the output grid. Points that cannot be carried into that
// system are left out.
std::vector<host::TiePoint> OutputTiePoints(const host::GcpSet &gcps,
                                            const char *groundGeosys,
                                            const std::string &fileGeosys,
                                            const ExportPlan &plan) {
    const double columnScale = 1.0 / plan.ColumnStep();
    const double lineScale = 1.0 / plan.LineStep();
    const bool sameSystem = fileGeosys == groundGeosys;
    std::vector<host::TiePoint> ties;
    for (const host::GroundControlPoint &gcp : gcps.points) {
        double x = gcp.x;
        double y = gcp.y;
        if (!sameSystem && GCTPSimpleTransform(groundGeosys, gcp.x, gcp.y,
                                               fileGeosys.c_str(), &x, &y) != 0)
            continue;
        // A point the product gives without a finite position (not a number,
        // infinite) georeferences nothing.
        if (!std::isfinite(x) || !std::isfinite(y) || !std::isfinite(gcp.z) ||
            !std::isfinite(gcp.pixel) || !std::isfinite(gcp.line))
            continue;
        ties.push_back({(gcp.pixel - plan.window.x) * columnScale,
                        (gcp.line - plan.window.y) * lineScale, x, y, gcp.z});
    }
    return ties;
}

} // namespace

// A GeoTIFF holds one model system: a UTM or geographic dataset gives its
// transform, and its ground control points join it in that system; without
// a map transform the points alone georeference the file, in WGS 84.
host::GeoTiffGeoreferencing OutputGeoreferencing(const host::Raster &raster,
                                                 const ExportPlan &plan) {
    host::GeoTiffGeoreferencing geo;
    const ProjInfo_t projection = raster.Projection();
    char system[kGeosysTextSize] = {};
    const int32_t code = DecodeGeosys(projection.geosys, system);
    if (code == kGeosysUTM || code == kGeosysLong) {
        geo.geosys = system;
        geo.hasTransform = true;
        geo.transform = WindowTransform(projection.transform, plan);
    }
    const host::GcpSet gcps = raster.GroundControlPoints();
    char ground[kGeosysTextSize] = {};
    const int32_t groundCode = DecodeGeosys(gcps.groundGeosys.c_str(), ground);
    if (gcps.points.empty() ||
        (groundCode != kGeosysUTM && groundCode != kGeosysLong))
        return geo;
    if (geo.geosys.empty()) {
        char geographic[kGeosysTextSize] = {};
        DecodeGeosys("LONG D000", geographic);
        geo.geosys = geographic;
    }
    geo.tiePoints = OutputTiePoints(gcps, ground, geo.geosys, plan);
    if (!geo.hasTransform && geo.tiePoints.empty())
        geo.geosys.clear();
    return geo;
}
