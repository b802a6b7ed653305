#pragma once

#include "host/GeoTiffWriter.hpp"
#include "host/Raster.hpp"
#include "tools/rs2/ExportPlan.hpp"

// What an exported file says about itself: the product's identity and
// acquisition, the calibration and units of its values, each band's
// polarization, and the value that marks no data.
host::GeoTiffDescription DescribeExport(const host::Raster &raster,
                                        const ExportPlan &plan);
