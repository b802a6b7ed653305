#pragma once

#include "tools/generator/ProductGenerator.hpp"

#include <string>

namespace rs2gen {

/// Writes the ProductDescription.self side file: "key = value;" lines in
/// sections opened by "name=" lines, repeating a few facts of product.xml.
/// Throws std::runtime_error when the file cannot be written.
void WriteSideFile(const std::string &path, const ProductOptions &options);

} // namespace rs2gen
