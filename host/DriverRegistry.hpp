#pragma once

#include "host/DriverTable.hpp"

#include <string>
#include <utility>
#include <vector>

namespace host {

/// The table of the registered driver, loading the driver module on first
/// use: VXB_DRIVER_PATH (the module file, or a folder holding it), then the
/// folder of libvxbhost.so, then the installation's library folder. Null
/// when no module could be loaded; the reason is then in LoadFailure().
const DriverTable *ActiveDriver();
/// Why the last load failed (empty when it did not).
const std::string &LoadFailure();
/// Path of the loaded module (empty before a load, or when none loaded).
const std::string &LoadedDriverPath();
/// The names and table offsets of the operations the driver filled in.
std::vector<std::pair<std::string, size_t>> RegisteredOperations();

/// File name of the driver module.
constexpr const char *kDriverModuleName = "rs2driver.so";

} // namespace host
