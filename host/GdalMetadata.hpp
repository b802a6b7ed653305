#pragma once

#include "host/GeoTiffWriter.hpp"

#include <string>

namespace host {

/// The text of the GDAL metadata tag for description: a <GDALMetadata>
/// element with one <Item> an image item, then a DESCRIPTION item (role
/// "description") and the items of each band, bands numbered from sample 0.
/// Empty when there is nothing to say.
std::string GdalMetadataXml(const GeoTiffDescription &description);

} // namespace host
