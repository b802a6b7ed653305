#include "tools/generator/SceneGeometry.hpp"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstdio>

namespace rs2gen {

namespace {

// Ascending passes at mid latitudes head slightly west of north; the radar
// looks to the right of the track, i.e. roughly east.
constexpr double headingDegrees = -12.0;
constexpr double metresPerDegreeLatitude = 111320.0;
constexpr double groundTrackSpeed = 6800.0; // m/s of the beam on the ground
constexpr double orbitSpeed = 7450.0;       // m/s of the satellite
// The earliest line is seen at 14:02:31.25 UTC, far enough from midnight
// that no product crosses into the next day.
constexpr const char *acquisitionDate = "2016-09-11";
constexpr double earliestLineTime = 14 * 3600.0 + 2 * 60.0 + 31.25;
// Products span a real beam's incidence range, although their swath is far
// narrower, so that the calibration of neighbouring columns visibly differs.
const BeamMode beamModes[] = {
    {"Standard", "S3", 30.4, 37.2, 1.28e3},
    {"Wide", "W2", 30.8, 39.5, 1.33e3},
    {"Fine", "F2", 36.4, 39.6, 1.33e3},
    {"Multi-Look Fine", "MF2", 33.5, 43.5, 1.30e3},
    {"Ultrafine", "U2", 31.0, 33.5, 3.70e3},
    {"Low Incidence", "EL1", 10.0, 23.0, 1.25e3},
    {"High Incidence", "EH3", 49.0, 52.0, 1.30e3},
    {"Standard Quad Polarization", "SQ9", 28.0, 30.9, 2.60e3},
    {"Fine Quad Polarization", "FQ9", 27.7, 29.5, 2.60e3},
    {"ScanSAR Narrow", "SCNA", 20.0, 39.4, 1.25e3},
    {"ScanSAR Wide", "SCWA", 20.0, 49.0, 1.25e3},
};
const ProductLayout productLayouts[] = {
    {"SLC", 4.733, 5.051, 1, 1}, {"SGX", 3.125, 3.125, 1, 1},
    {"SGF", 6.25, 6.25, 1, 4},   {"SGC", 8.0, 8.0, 1, 4},
    {"SCN", 25.0, 25.0, 2, 2},   {"SCW", 50.0, 50.0, 4, 2},
    {"SSG", 6.25, 6.25, 1, 4},   {"SPG", 6.25, 6.25, 1, 4},
};
const BeamMode &unknownAcquisitionBeam = beamModes[2];      // Fine
const ProductLayout &unknownTypeLayout = productLayouts[2]; // SGF

const BeamMode &BeamOf(const std::string &acquisitionType) {
    for (const BeamMode &mode : beamModes)
        if (SameIgnoringCase(acquisitionType, mode.acquisitionType))
            return mode;
    return unknownAcquisitionBeam;
}

const ProductLayout &LayoutOf(const std::string &productType) {
    for (const ProductLayout &layout : productLayouts)
        if (SameIgnoringCase(productType, layout.productType))
            return layout;
    return unknownTypeLayout;
}

std::array<double, 3> EarthCentred(double latitude, double longitude,
                                   double height) {
    const double phi = latitude / degreesPerRadian;
    const double lambda = longitude / degreesPerRadian;
    const double a = SceneGeometry::semiMajorAxis;
    const double b = SceneGeometry::semiMinorAxis;
    const double e2 = 1.0 - (b * b) / (a * a);
    const double n = a / std::sqrt(1.0 - e2 * std::sin(phi) * std::sin(phi));
    return {(n + height) * std::cos(phi) * std::cos(lambda),
            (n + height) * std::cos(phi) * std::sin(lambda),
            (n * (1.0 - e2) + height) * std::sin(phi)};
}

// A horizontal velocity given as east and north components, turned into
// earth-centred components at the given position.
std::array<double, 3> EarthCentredVelocity(double latitude, double longitude,
                                           double east, double north) {
    const double phi = latitude / degreesPerRadian;
    const double lambda = longitude / degreesPerRadian;
    return {-std::sin(lambda) * east - std::sin(phi) * std::cos(lambda) * north,
            std::cos(lambda) * east - std::sin(phi) * std::sin(lambda) * north,
            std::cos(phi) * north};
}

} // namespace

bool SameIgnoringCase(const std::string &a, const char *b) {
    const std::string other(b);
    return a.size() == other.size() &&
           std::equal(a.begin(), a.end(), other.begin(), [](char x, char y) {
               return std::tolower(static_cast<unsigned char>(x)) ==
                      std::tolower(static_cast<unsigned char>(y));
           });
}

std::string AcquisitionTypeText(const ProductOptions &options) {
    if (!options.acquisitionType.empty())
        return options.acquisitionType;
    if (options.polarizations.size() == 4)
        return "Fine Quad Polarization";
    if (SameIgnoringCase(options.productType, "SCN"))
        return "ScanSAR Narrow";
    if (SameIgnoringCase(options.productType, "SCW"))
        return "ScanSAR Wide";
    return "Fine";
}

bool IsComplexProduct(const ProductOptions &options) {
    return SameIgnoringCase(options.productType, "SLC");
}

double IncidenceAngleDegrees(const ProductOptions &options, int column) {
    return SceneGeometry(options).IncidenceDegrees(column);
}

std::string DateTimeText(double secondsOfDay) {
    // Whole microseconds first, so that rounding never yields 60 seconds.
    const long long micro = std::llround(secondsOfDay * 1e6);
    const long long seconds = micro / 1000000;
    char text[64];
    std::snprintf(text, sizeof text, "%sT%02lld:%02lld:%02lld.%06lldZ",
                  acquisitionDate, seconds / 3600, seconds / 60 % 60,
                  seconds % 60, micro % 1000000);
    return text;
}

SceneGeometry::SceneGeometry(const ProductOptions &options)
    : beam(BeamOf(AcquisitionTypeText(options))),
      layout(LayoutOf(options.productType)), complex(IsComplexProduct(options)),
      width(options.width), height(options.height),
      lineTimeDecreasing(options.lineTimeDecreasing),
      pixelTimeDecreasing(options.pixelTimeDecreasing),
      centerLatitude(options.centerLatitude),
      centerLongitude(options.centerLongitude) {}

double SceneGeometry::RangeFraction(int column) const {
    if (width == 1)
        return 0.0;
    const int fromNear = pixelTimeDecreasing ? width - 1 - column : column;
    return fromNear / static_cast<double>(width - 1);
}

double SceneGeometry::IncidenceDegrees(int column) const {
    return beam.nearIncidence +
           (beam.farIncidence - beam.nearIncidence) * RangeFraction(column);
}

int SceneGeometry::NearRangeColumn() const {
    return pixelTimeDecreasing ? width - 1 : 0;
}

int SceneGeometry::FarRangeColumn() const {
    return pixelTimeDecreasing ? 0 : width - 1;
}

double SceneGeometry::MidIncidenceRadians() const {
    return 0.5 * (beam.nearIncidence + beam.farIncidence) / degreesPerRadian;
}

double SceneGeometry::GroundPixelSpacing() const {
    // A slant-range spacing stretches on the ground by 1 / sin(incidence).
    return complex ? layout.pixelSpacing / std::sin(MidIncidenceRadians())
                   : layout.pixelSpacing;
}

GroundPoint SceneGeometry::Offset(double rangeMetres,
                                  double alongTrackMetres) const {
    const double heading = headingDegrees / degreesPerRadian;
    const double east =
        rangeMetres * std::cos(heading) + alongTrackMetres * std::sin(heading);
    const double north =
        -rangeMetres * std::sin(heading) + alongTrackMetres * std::cos(heading);
    const double metresPerDegreeLongitude =
        metresPerDegreeLatitude * std::cos(centerLatitude / degreesPerRadian);
    return {centerLatitude + north / metresPerDegreeLatitude,
            centerLongitude + east / metresPerDegreeLongitude, terrainHeight};
}

GroundPoint SceneGeometry::Ground(double pixel, double line) const {
    const double towardFar = pixelTimeDecreasing ? -1.0 : 1.0;
    const double towardLater = lineTimeDecreasing ? -1.0 : 1.0;
    return Offset(
        towardFar * (pixel - 0.5 * (width - 1)) * GroundPixelSpacing(),
        towardLater * (line - 0.5 * (height - 1)) * layout.lineSpacing);
}

double SceneGeometry::PixelShiftPerMetreOfHeight() const {
    const double towardFar = pixelTimeDecreasing ? -1.0 : 1.0;
    return -towardFar /
           (std::tan(MidIncidenceRadians()) * GroundPixelSpacing());
}

std::vector<TiePoint> SceneGeometry::TieGrid(int columns, int rows) const {
    columns = std::clamp(columns, 1, width);
    rows = std::clamp(rows, 1, height);
    // Evenly spread integer positions, the last one on the last pixel/line.
    auto position = [](int index, int count, int size) {
        return count == 1 ? 0
                          : static_cast<int>(static_cast<long long>(index) *
                                             (size - 1) / (count - 1));
    };
    std::vector<TiePoint> grid;
    grid.reserve(static_cast<size_t>(columns) * rows);
    for (int row = 0; row < rows; ++row) {
        const int line = position(row, rows, height);
        for (int column = 0; column < columns; ++column) {
            const int pixel = position(column, columns, width);
            grid.push_back({pixel, line, Ground(pixel, line)});
        }
    }
    return grid;
}

double SceneGeometry::SlantRangeNearEdge() const {
    return satelliteHeight / std::cos(beam.nearIncidence / degreesPerRadian);
}

std::array<double, 6> SceneGeometry::GroundToSlantRangeCoefficients() const {
    const double r0 = SlantRangeNearEdge();
    if (complex) // the columns of an SLC product are already in slant range
        return {r0, 1.0, 0.0, 0.0, 0.0, 0.0};
    // Over flat ground, slant range is sqrt(H^2 + (g0 + g)^2) for a ground
    // range g past the near edge, which lies g0 = H tan(near incidence) from
    // nadir. Its Taylor series a follows from squaring it:
    // sum a_i a_(k-i) equals H^2 + g0^2, 2 g0 and 1 for k = 0, 1, 2 and 0
    // beyond.
    const double g0 =
        satelliteHeight * std::tan(beam.nearIncidence / degreesPerRadian);
    std::array<double, 6> a{};
    a[0] = r0;
    a[1] = g0 / r0;
    a[2] = (1.0 - a[1] * a[1]) / (2.0 * r0);
    for (size_t k = 3; k < a.size(); ++k) {
        double sum = 0.0;
        for (size_t i = 1; i < k; ++i)
            sum += a[i] * a[k - i];
        a[k] = -sum / (2.0 * r0);
    }
    return a;
}

double SceneGeometry::LineTime(int line) const {
    const int fromEarliest = lineTimeDecreasing ? height - 1 - line : line;
    return earliestLineTime +
           fromEarliest * (layout.lineSpacing / groundTrackSpeed);
}

double SceneGeometry::EarliestLineTime() const { return earliestLineTime; }

double SceneGeometry::LatestLineTime() const {
    return std::max(LineTime(0), LineTime(height - 1));
}

double SceneGeometry::RawDataStartTime() const {
    return earliestLineTime - 0.352;
}

std::vector<StateVector> SceneGeometry::StateVectors() const {
    // Five vectors from 4 s before the first line to 4 s after the last.
    const double first = EarliestLineTime() - 4.0;
    const double step = (LatestLineTime() + 4.0 - first) / 4.0;
    const double middle = 0.5 * (EarliestLineTime() + LatestLineTime());
    // The satellite flies to the left of the swath centre at the distance
    // from which it sees the centre under the mid-swath incidence angle.
    const double sideways = -satelliteHeight * std::tan(MidIncidenceRadians());
    const double heading = headingDegrees / degreesPerRadian;
    std::vector<StateVector> vectors;
    for (int k = 0; k < 5; ++k) {
        const double time = first + k * step;
        const GroundPoint nadir =
            Offset(sideways, (time - middle) * groundTrackSpeed);
        vectors.push_back(
            {time,
             EarthCentred(nadir.latitude, nadir.longitude, satelliteHeight),
             EarthCentredVelocity(nadir.latitude, nadir.longitude,
                                  orbitSpeed * std::sin(heading),
                                  orbitSpeed * std::cos(heading))});
    }
    return vectors;
}

std::vector<AttitudeSample> SceneGeometry::Attitudes() const {
    // The antenna is rolled toward the swath; earth curvature makes the look
    // angle a few degrees smaller than the incidence angle.
    const double roll = -(MidIncidenceRadians() * degreesPerRadian - 4.0);
    std::vector<AttitudeSample> samples;
    for (const StateVector &vector : StateVectors()) {
        const double drift = vector.secondsOfDay - earliestLineTime;
        samples.push_back({vector.secondsOfDay, -3.45 - 0.0019 * drift,
                           roll + 0.0002 * drift, 0.0013 + 0.0001 * drift});
    }
    return samples;
}

} // namespace rs2gen
