#pragma once

#include "host/Raster.hpp"

#include <array>
#include <vector>

// One point of the product's geolocation grid: a raster position
// (pixel-is-area, so the centre of the first pixel is 0.5, 0.5) and where it
// lies on the WGS 84 ellipsoid.
struct GridTiePoint {
    double pixel, line;
    double longitude, latitude, height; // degrees, metres
};

// Every tie point of the dataset's geolocation grid, as the GeolocationGrid
// entry of its metadata (object type 1) lists them: all of them, where the
// ground control points are a thinned selection. Empty when the dataset
// states no grid.
std::vector<GridTiePoint> GeolocationGrid(const host::Entries &metadata);

// How far an affine map transform is from the tie points: for each point,
// the distance between where the transform puts its raster position and its
// own position carried into the transform's system, in map units and in
// dataset pixels (columns, lines).
struct AffineMisfit {
    std::vector<double> mapDistance;
    std::vector<std::array<double, 2>> pixelOffset;
    double MaxMapDistance() const;
    double RmsMapDistance() const;
};

// The misfit of the dataset's transform against grid. Points that cannot be
// carried into the transform's system are left out.
AffineMisfit MeasureAffineMisfit(const ProjInfo_t &projection,
                                 const std::vector<GridTiePoint> &grid);
