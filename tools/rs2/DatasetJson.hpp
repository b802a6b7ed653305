#pragma once

#include "host/Raster.hpp"

#include <nlohmann/json.hpp>

/// Everything the driver presents about an open dataset, as the JSON
/// object `rs2 info --json` prints.
nlohmann::json DescribeDataset(const host::Raster &raster);
