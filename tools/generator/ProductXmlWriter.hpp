#pragma once

#include "tools/generator/ProductGenerator.hpp"

#include <string>

namespace rs2gen {

/// Writes product.xml: the product's annotation laid out as a real product
/// description (same namespace, nesting and element order), holding every
/// element the driver reads with values consistent with the images, the
/// look-up tables and the scene geometry. Throws std::runtime_error when
/// the file cannot be written.
void WriteProductXml(const std::string &path, const ProductOptions &options);

} // namespace rs2gen
