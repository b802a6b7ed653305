#include "tools/generator/SampleField.hpp"

#include <algorithm>
#include <cmath>
#include <limits>
#include <stdexcept>
#include <string>

namespace rs2gen {

namespace {

// A 64-bit finaliser with full avalanche: every input bit flips about half
// of the output bits, so neighbouring positions get unrelated values.
uint64_t Mix(uint64_t z) {
    z += 0x9e3779b97f4a7c15ULL;
    z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9ULL;
    z = (z ^ (z >> 27)) * 0x94d049bb133111ebULL;
    return z ^ (z >> 31);
}

// Mixed once per pixel and then combined with a key per use, so that each
// further value of a pixel costs one mix.
uint64_t PositionHash(int x, int y) {
    return Mix((static_cast<uint64_t>(static_cast<uint32_t>(x)) << 32) |
               static_cast<uint32_t>(y));
}

double UnitInterval(uint64_t hash) { // [0, 1) from the top 53 bits
    return static_cast<double>(hash >> 11) * 0x1.0p-53;
}

int ByteSum(uint64_t bits) {
    int sum = 0;
    for (int i = 0; i < 4; ++i, bits >>= 8)
        sum += static_cast<int>(bits & 0xff);
    return sum;
}

// Cross-polarized returns are much weaker than co-polarized ones; a name
// outside the four gets a level in between.
double PolarizationGain(const std::string &polarization) {
    const struct {
        const char *name;
        double gain;
    } gains[] = {{"HH", 1.0}, {"VV", 0.85}, {"HV", 0.3}, {"VH", 0.3}};
    for (const auto &entry : gains)
        if (SameIgnoringCase(polarization, entry.name))
            return entry.gain;
    return 0.6;
}

template <typename Sample> Sample Rounded(double value) {
    const double low = std::numeric_limits<Sample>::min();
    const double high = std::numeric_limits<Sample>::max();
    return static_cast<Sample>(std::lround(std::clamp(value, low, high)));
}

} // namespace

SampleField::SampleField(const ProductOptions &options, int polarizationIndex)
    : geometry(options), sceneKey(Mix(options.seed)),
      speckleKey(Mix(sceneKey + static_cast<uint64_t>(polarizationIndex) + 1)),
      looks(IsComplexProduct(options) ? 1
                                      : geometry.Layout().rangeLooks *
                                            geometry.Layout().azimuthLooks),
      fieldSize(std::max(4, (std::min(options.width, options.height) + 5) / 6)),
      ringPeriod(std::max(8.0, std::min(options.width, options.height) / 5.0)),
      polarizationGain(0.0) {
    if (polarizationIndex < 0 ||
        polarizationIndex >= static_cast<int>(options.polarizations.size()))
        throw std::out_of_range("polarization index " +
                                std::to_string(polarizationIndex) +
                                " is not in the product");
    polarizationGain =
        PolarizationGain(options.polarizations[polarizationIndex]);
}

double SampleField::Reflectivity(int x, int y) const {
    const double field =
        0.35 + 0.65 * UnitInterval(Mix(sceneKey ^ PositionHash(x / fieldSize,
                                                               y / fieldSize)));
    const double dx = x - 0.5 * (geometry.Width() - 1);
    const double dy = y - 0.5 * (geometry.Height() - 1);
    const double phase = std::sqrt(dx * dx + dy * dy) / ringPeriod;
    const double withinRing = phase - std::floor(phase);
    const double ring =
        1.0 + 0.8 * std::max(0.0, 1.0 - 4.0 * std::fabs(withinRing - 0.5));
    // Backscatter weakens toward far range as the incidence angle grows.
    const double gradient = 1.25 - 0.5 * geometry.RangeFraction(x);
    return 90.0 * field * ring * gradient * polarizationGain;
}

std::pair<double, double> SampleField::Speckle(uint64_t position,
                                               int look) const {
    // A sum of four uniform bytes is close to normal (mean 510, variance
    // 4 * (256^2 - 1) / 12); one such sum per component gives circular
    // complex speckle, scaled here to unit mean power.
    const double unitPower =
        1.0 / std::sqrt(2.0 * 4.0 * (256.0 * 256.0 - 1.0) / 12.0);
    const uint64_t bits =
        Mix((speckleKey + static_cast<uint64_t>(look)) ^ position);
    return {(ByteSum(bits) - 510) * unitPower,
            (ByteSum(bits >> 32) - 510) * unitPower};
}

uint16_t SampleField::Detected(int x, int y) const {
    const uint64_t position = PositionHash(x, y);
    double power = 0.0;
    for (int look = 0; look < looks; ++look) {
        const auto [i, q] = Speckle(position, look);
        power += i * i + q * q;
    }
    return Rounded<uint16_t>(Reflectivity(x, y) * std::sqrt(power / looks));
}

std::pair<int16_t, int16_t> SampleField::Complex(int x, int y) const {
    const double amplitude = Reflectivity(x, y);
    const auto [i, q] = Speckle(PositionHash(x, y), 0);
    return {Rounded<int16_t>(amplitude * i), Rounded<int16_t>(amplitude * q)};
}

static SampleField CheckedField(const ProductOptions &options,
                                int polarizationIndex, int x, int y) {
    if (x < 0 || y < 0 || x >= options.width || y >= options.height)
        throw std::out_of_range("sample position outside the image");
    return SampleField(options, polarizationIndex);
}

uint16_t DetectedSample(const ProductOptions &options, int polarizationIndex,
                        int x, int y) {
    return CheckedField(options, polarizationIndex, x, y).Detected(x, y);
}

std::pair<int16_t, int16_t> ComplexSample(const ProductOptions &options,
                                          int polarizationIndex, int x, int y) {
    return CheckedField(options, polarizationIndex, x, y).Complex(x, y);
}

} // namespace rs2gen
