#pragma once

#include "host/GeoTiffImage.hpp"

#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>

namespace host {

/// What a host raster handle points to.
struct RasterHandle {
    enum class Kind { GeoTiff, DriverDataset };

    Kind kind = Kind::DriverDataset;
    std::string name;
    // Layout declared by RawDefine (driver datasets only).
    bool defined = false;
    int32_t width = 0;                   // pixels per line
    int32_t height = 0;                  // lines
    int32_t channels = 0;                // channel count
    int32_t typeCode = 0;                // ChannelTypeCode of every channel
    std::unique_ptr<GeoTiffImage> image; // GeoTiff handles only
};

/// The handle object behind fp, or null when fp is not a live handle.
RasterHandle *LookupHandle(FILE *fp);
/// Takes ownership of a handle object and gives it its FILE* identity.
FILE *RegisterHandle(std::unique_ptr<RasterHandle> handle);
/// Removes fp from the registry; the caller destroys the returned object.
std::unique_ptr<RasterHandle> UnregisterHandle(FILE *fp);
/// Number of live handles of either kind (what is open right now).
size_t LiveHandleCount();

} // namespace host
