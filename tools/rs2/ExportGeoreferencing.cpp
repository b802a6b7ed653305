#include "tools/rs2/ExportGeoreferencing.hpp"

#include "host/RasterServices.hpp"
#include "tools/rs2/ExportRpc.hpp"
#include "tools/rs2/TiePointGrid.hpp"

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
// system are left out, and all of them when the dataset gives them in a
// system without ground meaning.
std::vector<host::TiePoint> DatasetTiePoints(const host::Raster &raster,
                                             const std::string &fileGeosys,
                                             const ExportPlan &plan) {
    const host::GcpSet gcps = raster.GroundControlPoints();
    char groundGeosys[kGeosysTextSize] = {};
    const int32_t groundCode =
        DecodeGeosys(gcps.groundGeosys.c_str(), groundGeosys);
    if (groundCode != kGeosysUTM && groundCode != kGeosysLong)
        return {};
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

// Whether the transform puts every tie point of the grid within half an
// output pixel of its place. A slant-range image is evenly spaced in range
// time, not on the ground, so no affine map may describe it; a map-projected
// product passes. A grid of which no point reaches the transform's system
// contradicts nothing.
bool TransformFitsGrid(const ProjInfo_t &projection,
                       const std::vector<GridTiePoint> &grid,
                       const ExportPlan &plan) {
    const AffineMisfit misfit = MeasureAffineMisfit(projection, grid);
    for (const auto &[columns, lines] : misfit.pixelOffset) {
        if (std::hypot(columns / plan.ColumnStep(), lines / plan.LineStep()) >
            0.5)
            return false;
    }
    return true;
}

// The grid's points at their positions in the output grid, in WGS 84
// geographic coordinates. A grid beyond what a file holds is thinned evenly.
std::vector<host::TiePoint>
OutputGridPoints(const std::vector<GridTiePoint> &grid,
                 const ExportPlan &plan) {
    const size_t step = grid.size() / host::kMaxTiePoints + 1;
    std::vector<host::TiePoint> ties;
    for (size_t i = 0; i < grid.size(); i += step) {
        const GridTiePoint &point = grid[i];
        ties.push_back({(point.pixel - plan.window.x) / plan.ColumnStep(),
                        (point.line - plan.window.y) / plan.LineStep(),
                        point.longitude, point.latitude, point.height});
    }
    return ties;
}

std::string GeographicSystem() {
    char geographic[kGeosysTextSize] = {};
    DecodeGeosys("LONG D000", geographic);
    return geographic;
}

} // namespace

// A GeoTIFF holds one model system. A UTM or geographic dataset whose
// transform fits its tie points gives that transform, and its ground control
// points join it in that system. Otherwise the control points alone
// georeference the file, in WGS 84: every point of the geolocation grid, or
// the dataset's own points when it states no grid. The RPC model joins
// either where it agrees with the grid.
host::GeoTiffGeoreferencing OutputGeoreferencing(const host::Raster &raster,
                                                 const ExportPlan &plan) {
    host::GeoTiffGeoreferencing geo;
    const ProjInfo_t projection = raster.Projection();
    const std::vector<GridTiePoint> grid = GeolocationGrid(raster.Metadata(1));
    char system[kGeosysTextSize] = {};
    const int32_t code = DecodeGeosys(projection.geosys, system);
    if ((code == kGeosysUTM || code == kGeosysLong) &&
        TransformFitsGrid(projection, grid, plan)) {
        geo.geosys = system;
        geo.hasTransform = true;
        geo.transform = WindowTransform(projection.transform, plan);
    } else {
        geo.geosys = GeographicSystem();
        geo.tiePoints = OutputGridPoints(grid, plan);
    }
    if (geo.tiePoints.empty())
        geo.tiePoints = DatasetTiePoints(raster, geo.geosys, plan);
    if (!geo.hasTransform && geo.tiePoints.empty())
        geo.geosys.clear();
    else
        geo.rpcCoefficients = OutputRpcCoefficients(raster, grid, plan);
    return geo;
}
