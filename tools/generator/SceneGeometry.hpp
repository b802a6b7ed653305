#pragma once

#include "tools/generator/ProductGenerator.hpp"

#include <array>
#include <string>
#include <vector>

namespace rs2gen {

inline constexpr double degreesPerRadian = 57.29577951308232;

/// The radar beam of an acquisition type.
struct BeamMode {
    const char *acquisitionType;     // text of `acquisitionType`
    const char *mnemonic;            // text of `beamModeMnemonic`
    double nearIncidence;            // degrees at the near edge of the swath
    double farIncidence;             // degrees at the far edge
    double pulseRepetitionFrequency; // Hz
};

/// How a product type samples the scene.
struct ProductLayout {
    const char *productType;
    double pixelSpacing; // metres between columns: slant range for SLC,
                         // ground range otherwise
    double lineSpacing;  // metres between lines along the track
    int rangeLooks;
    int azimuthLooks;
};

struct GroundPoint {
    double latitude;  // degrees north
    double longitude; // degrees east
    double height;    // metres above the WGS84 ellipsoid
};

/// One point of the geolocation grid, at an integer image position.
struct TiePoint {
    int pixel;
    int line;
    GroundPoint ground;
};

struct StateVector {
    double secondsOfDay;            // UTC on the acquisition date
    std::array<double, 3> position; // earth-centred earth-fixed, metres
    std::array<double, 3> velocity; // metres per second
};

struct AttitudeSample {
    double secondsOfDay;
    double yaw, roll, pitch; // degrees
};

/// Where the pixels of a generated product lie on the ground, when their
/// lines were seen and where the satellite was meanwhile: an ascending,
/// right-looking pass over a flat scene at constant terrain height. The
/// footprint is affine in pixel and line, which keeps the tie points, the
/// rational functions and the image tie points exactly consistent.
class SceneGeometry {
  public:
    explicit SceneGeometry(const ProductOptions &options);

    const BeamMode &Beam() const { return beam; }
    const ProductLayout &Layout() const { return layout; }
    int Width() const { return width; }
    int Height() const { return height; }

    /// 0 at the near-range column, 1 at the far-range column.
    double RangeFraction(int column) const;
    double IncidenceDegrees(int column) const;
    int NearRangeColumn() const;
    int FarRangeColumn() const;

    /// Ground position of an image position (pixel, line), both counted
    /// from 0 at the centre of the first pixel of the first line.
    GroundPoint Ground(double pixel, double line) const;
    /// Image columns per metre that raised terrain moves toward near range:
    /// radar layover, used by the height term of the rational functions.
    double PixelShiftPerMetreOfHeight() const;
    /// The geolocation grid, line by line; its corners are the image corners.
    std::vector<TiePoint> TieGrid(int columns, int rows) const;

    double GroundPixelSpacing() const; // metres between columns on the ground
    double SlantRangeNearEdge() const; // metres
    /// Slant range as a polynomial in ground range from the near edge.
    std::array<double, 6> GroundToSlantRangeCoefficients() const;

    double LineTime(int line) const; // UTC seconds of the acquisition day
    double EarliestLineTime() const;
    double LatestLineTime() const;
    double RawDataStartTime() const;
    std::vector<StateVector> StateVectors() const;
    std::vector<AttitudeSample> Attitudes() const;

    static constexpr double satelliteHeight = 7.98e5; // metres
    static constexpr double terrainHeight = 120.0;    // metres
    static constexpr double semiMajorAxis = 6378137.0;
    static constexpr double semiMinorAxis = 6356752.314245179;

  private:
    GroundPoint Offset(double rangeMetres, double alongTrackMetres) const;
    double MidIncidenceRadians() const;

    const BeamMode &beam;
    const ProductLayout &layout;
    bool complex;
    int width, height;
    bool lineTimeDecreasing, pixelTimeDecreasing;
    double centerLatitude, centerLongitude;
};

/// Names in product.xml (types, polarizations) are read ignoring case.
bool SameIgnoringCase(const std::string &a, const char *b);

/// Text of a UTC time of the acquisition day, e.g. 2016-09-11T14:02:31.250000Z.
std::string DateTimeText(double secondsOfDay);

} // namespace rs2gen
