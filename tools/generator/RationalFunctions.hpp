#pragma once

#include "tools/generator/SceneGeometry.hpp"

#include <array>

namespace rs2gen {

/// A rational function model from latitude, longitude and height to image
/// line and pixel. Coefficients follow the usual 20-term order: 1, L, P, H,
/// LP, LH, PH, L^2, P^2, H^2, PLH, L^3, LP^2, LH^2, L^2P, P^3, PH^2, L^2H,
/// P^2H, H^3, with L, P and H the normalised longitude, latitude and height.
struct RationalFunctionModel {
    double lineOffset, pixelOffset;                       // image positions
    double latitudeOffset, longitudeOffset, heightOffset; // degrees, metres
    double lineScale, pixelScale;
    double latitudeScale, longitudeScale, heightScale;
    std::array<double, 20> lineNumerator{}, lineDenominator{};
    std::array<double, 20> pixelNumerator{}, pixelDenominator{};
};

/// The exact inverse of the scene's affine footprint, with radar layover as
/// the height term of the pixel polynomial; denominators are 1.
RationalFunctionModel RationalFunctionsOf(const SceneGeometry &geometry);

} // namespace rs2gen
