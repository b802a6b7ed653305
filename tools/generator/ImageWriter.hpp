#pragma once

#include "tools/generator/ProductGenerator.hpp"

#include <string>

namespace rs2gen {

/// Writes the GeoTIFF of one polarization line by line, so memory stays at
/// one line whatever the image size: 16-bit unsigned amplitudes for detected
/// products, 16-bit signed in-phase/quadrature pairs for SLC products, and
/// with `options.tiePoints` geographic WGS84 tie points at the pixel centres
/// of the geolocation grid. Throws std::runtime_error with libtiff's message
/// when the file cannot be written.
void WriteImage(const std::string &path, const ProductOptions &options,
                int polarizationIndex);

} // namespace rs2gen
