#pragma once

#include <cstdint>

// Name tables of the metadata the host is given. The model's FileMetadata,
// ChannelMetadata, IncidenceAngleMetadata, ChannelDescription and
// ProductTypeEntry (declared with the model) are defined beside them.

/// Name of a ProductType value ("SLC" ... "SPG", else "UNKNOWN") as a new
/// host string; the caller frees it with free().
char *ProductTypeName(int32_t productType);
/// Short name of a calibration type ("Beta Nought" -> "Beta0", "Sigma
/// Nought" -> "Sigma0", "Gamma", "None"; any case) as a new host string the
/// caller frees with free(); null for any other text or null.
char *CalibrationShortName(const char *calibrationType);
