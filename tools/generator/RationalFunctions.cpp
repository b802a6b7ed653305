#include "tools/generator/RationalFunctions.hpp"

#include <algorithm>
#include <cmath>

namespace rs2gen {

namespace {

constexpr size_t longitudeTerm = 1, latitudeTerm = 2, heightTerm = 3;

// Half the extent of the image corners around the centre, rounded up to
// 1e-4 degrees and never 0, so that normalised coordinates stay in [-1, 1].
double HalfExtent(const SceneGeometry &geometry, double GroundPoint::*member,
                  double centre) {
    const double right = geometry.Width() - 1, bottom = geometry.Height() - 1;
    double extent = 0.0;
    for (const GroundPoint &corner :
         {geometry.Ground(0, 0), geometry.Ground(right, 0),
          geometry.Ground(0, bottom), geometry.Ground(right, bottom)})
        extent = std::max(extent, std::fabs(corner.*member - centre));
    return std::max(std::ceil(extent * 1e4) / 1e4, 1e-4);
}

} // namespace

RationalFunctionModel RationalFunctionsOf(const SceneGeometry &geometry) {
    RationalFunctionModel model{};
    model.pixelOffset = 0.5 * (geometry.Width() - 1);
    model.lineOffset = 0.5 * (geometry.Height() - 1);
    model.pixelScale = (geometry.Width() + 1) / 2;
    model.lineScale = (geometry.Height() + 1) / 2;
    const GroundPoint centre =
        geometry.Ground(model.pixelOffset, model.lineOffset);
    model.latitudeOffset = centre.latitude;
    model.longitudeOffset = centre.longitude;
    model.heightOffset = SceneGeometry::terrainHeight;
    model.latitudeScale =
        HalfExtent(geometry, &GroundPoint::latitude, centre.latitude);
    model.longitudeScale =
        HalfExtent(geometry, &GroundPoint::longitude, centre.longitude);
    model.heightScale = 500.0;

    // The footprint is affine, so one step along a pixel and along a line
    // gives its derivatives exactly, and the inverse of that 2x2 matrix is
    // the whole model apart from the height term.
    const GroundPoint nextPixel =
        geometry.Ground(model.pixelOffset + 1.0, model.lineOffset);
    const GroundPoint nextLine =
        geometry.Ground(model.pixelOffset, model.lineOffset + 1.0);
    const double latPerPixel = nextPixel.latitude - centre.latitude;
    const double latPerLine = nextLine.latitude - centre.latitude;
    const double lonPerPixel = nextPixel.longitude - centre.longitude;
    const double lonPerLine = nextLine.longitude - centre.longitude;
    const double determinant =
        latPerPixel * lonPerLine - latPerLine * lonPerPixel;

    model.pixelNumerator[latitudeTerm] =
        lonPerLine * model.latitudeScale / (determinant * model.pixelScale);
    model.pixelNumerator[longitudeTerm] =
        -latPerLine * model.longitudeScale / (determinant * model.pixelScale);
    model.pixelNumerator[heightTerm] = geometry.PixelShiftPerMetreOfHeight() *
                                       model.heightScale / model.pixelScale;
    model.lineNumerator[latitudeTerm] =
        -lonPerPixel * model.latitudeScale / (determinant * model.lineScale);
    model.lineNumerator[longitudeTerm] =
        latPerPixel * model.longitudeScale / (determinant * model.lineScale);
    model.pixelDenominator[0] = 1.0;
    model.lineDenominator[0] = 1.0;
    return model;
}

} // namespace rs2gen
