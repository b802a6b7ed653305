#pragma once

#include "tools/generator/ProductGenerator.hpp"

#include <array>
#include <string>
#include <vector>

namespace rs2gen {

/// A calibration kind as the `lookupTable` attribute names it, and the
/// file that holds its table.
struct CalibrationKind {
    const char *name;
    const char *fileName;
};

/// The three kinds in the order product.xml lists them.
extern const std::array<CalibrationKind, 3> calibrationKinds;

/// Text of every gain of a table, one per image column, as the file holds it.
/// Throws std::invalid_argument for a kind not in `calibrationKinds`.
std::vector<std::string> GainTexts(const ProductOptions &options,
                                   const std::string &kind);

/// Text of the offset of every table.
std::string OffsetText(const ProductOptions &options);

/// Writes the look-up table file of a kind; throws std::runtime_error when
/// it cannot be written.
void WriteLookupTableFile(const std::string &path,
                          const ProductOptions &options,
                          const std::string &kind);

/// The noise floor across the swath, sampled every `stepSize` columns.
struct NoiseProfile {
    int firstPixel;
    int stepSize;
    std::vector<double> levels; // dB, in the scale of the calibration kind
};

NoiseProfile ReferenceNoiseLevels(const ProductOptions &options,
                                  const std::string &kind);

} // namespace rs2gen
