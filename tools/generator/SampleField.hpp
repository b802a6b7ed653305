#pragma once

#include "tools/generator/SceneGeometry.hpp"

#include <cstdint>
#include <utility>

namespace rs2gen {

/// The image content of one polarization: a scene of fields, rings and a
/// near-to-far brightness gradient, multiplied by speckle. Every sample is
/// computed on its own from (seed, polarization index, column, line), so the
/// image writer and the random-access truth functions share one definition
/// and agree bit for bit.
class SampleField {
  public:
    SampleField(const ProductOptions &options, int polarizationIndex);

    /// Amplitude of a detected product: the scene times the root of the
    /// mean speckle intensity over the product's looks.
    uint16_t Detected(int x, int y) const;
    /// In-phase and quadrature samples of a single-look complex product.
    std::pair<int16_t, int16_t> Complex(int x, int y) const;

  private:
    double Reflectivity(int x, int y) const; // amplitude of the scene
    // Circular complex speckle of unit mean power for one look of the pixel
    // whose position hash is given.
    std::pair<double, double> Speckle(uint64_t position, int look) const;

    SceneGeometry geometry;
    uint64_t sceneKey;   // the scene is the same for every polarization
    uint64_t speckleKey; // speckle is independent per polarization
    int looks;
    int fieldSize;     // pixels per side of a field
    double ringPeriod; // pixels between rings
    double polarizationGain;
};

} // namespace rs2gen
