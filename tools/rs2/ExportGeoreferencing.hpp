#pragma once

#include "host/GeoTiffWriter.hpp"
#include "host/Raster.hpp"
#include "tools/rs2/ExportPlan.hpp"

// The georeferencing of an exported file: the dataset's, carried to the
// output grid (its window, resampling and looks).
host::GeoTiffGeoreferencing OutputGeoreferencing(const host::Raster &raster,
                                                 const ExportPlan &plan);
