#pragma once

#include "host/GeoTiffImage.hpp"
#include "host/TiffFile.hpp"

#include <string>
#include <vector>

namespace host {

/// What a GeoTIFF says about where it lies on the ground.
struct TiffGeoreferencing {
    /// The coordinate system and affine transform; "PIXEL" with an identity
    /// transform when the file has no affine georeferencing.
    ProjInfo_t projection;
    std::string tiePointGeosys; // system of the tie points' model coordinates
    std::vector<TiePoint> tiePoints;
    /// The RPC model as an RF block; empty when the file has none.
    std::vector<unsigned char> rpcBlock;
};

/// Reads the GeoTIFF keys, the georeferencing tags and the RPC tag of file.
/// Known systems: WGS 84 geographic ("LONG D000": EPSG 4326, or the WGS 84
/// datum) and WGS 84 / UTM (EPSG 326zz north, 327zz south: "UTM zz B D000",
/// B the latitude band of the image centre, or of the mean tie point without
/// an affine transform; 'N' north or 'M' south when the band cannot be
/// judged or lies in the other hemisphere). Any other system gives "PIXEL"
/// and an identity transform; a malformed RPC tag gives no RPC block. Never
/// throws for what the file declares.
TiffGeoreferencing ReadTiffGeoreferencing(const TiffFile &file, int32_t width,
                                          int32_t height);

} // namespace host
