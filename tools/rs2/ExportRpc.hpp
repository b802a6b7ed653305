#pragma once

#include "host/Raster.hpp"
#include "tools/rs2/ExportPlan.hpp"
#include "tools/rs2/TiePointGrid.hpp"

#include <vector>

// The dataset's RPC model carried to the output grid, as the 92 values of
// the GeoTIFF RPC tag (RPCCoefficientTag): error bias and random error, the
// line, sample, latitude, longitude and height offsets and then scales, the
// line numerator and denominator and the sample numerator and denominator
// coefficients. Empty when the dataset has no model, states no grid to
// check it against, or when the model misses a grid point by more than half
// an output pixel: a file is better without a model than with a wrong one.
std::vector<double> OutputRpcCoefficients(const host::Raster &raster,
                                          const std::vector<GridTiePoint> &grid,
                                          const ExportPlan &plan);
