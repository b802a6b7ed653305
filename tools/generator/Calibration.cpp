#include "tools/generator/Calibration.hpp"

#include "tools/generator/SceneGeometry.hpp"
#include "tools/generator/TextFile.hpp"
#include "tools/generator/XmlWriter.hpp"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <stdexcept>

namespace rs2gen {

const std::array<CalibrationKind, 3> calibrationKinds = {{
    {"Beta Nought", "lutBeta.xml"},
    {"Sigma Nought", "lutSigma.xml"},
    {"Gamma", "lutGamma.xml"},
}};

namespace {

// Beta gains are the same for every column; detected products calibrate
// squared amplitudes, so their gain is the square of the SLC one.
constexpr double complexBetaGain = 199.5262;
constexpr double detectedBetaGain = complexBetaGain * complexBetaGain;

enum class Kind { Beta, Sigma, Gamma };

Kind KindOf(const std::string &name) {
    for (size_t i = 0; i < calibrationKinds.size(); ++i)
        if (name == calibrationKinds[i].name)
            return static_cast<Kind>(i);
    throw std::invalid_argument("unknown calibration kind '" + name + "'");
}

// The gains follow from sigma0 = beta0 sin(theta) and gamma0 = sigma0 /
// cos(theta), theta being the incidence angle of the column. A detected
// sample calibrates as (DN^2 + offset) / gain, so gains are divisors of
// power: sigma gain = beta gain / sin(theta), gamma gain = sigma gain *
// cos(theta). An SLC sample calibrates as I / gain and Q / gain, a divisor
// of amplitude, so there each factor enters as its square root: beta gain /
// sigma gain = sqrt(sin(theta)).
double Gain(Kind kind, bool complex, double incidenceDegrees) {
    const double theta = incidenceDegrees / degreesPerRadian;
    const double exponent = complex ? 0.5 : 1.0;
    const double beta = complex ? complexBetaGain : detectedBetaGain;
    const double sigma = beta / std::pow(std::sin(theta), exponent);
    switch (kind) {
    case Kind::Beta:
        return beta;
    case Kind::Sigma:
        return sigma;
    case Kind::Gamma:
        return sigma * std::pow(std::cos(theta), exponent);
    }
    throw std::logic_error("calibration kind out of range");
}

} // namespace

std::vector<std::string> GainTexts(const ProductOptions &options,
                                   const std::string &kind) {
    const Kind which = KindOf(kind);
    const SceneGeometry geometry(options);
    const bool complex = IsComplexProduct(options);
    std::vector<std::string> texts;
    texts.reserve(static_cast<size_t>(options.width));
    for (int column = 0; column < options.width; ++column)
        texts.push_back(ScientificText(
            Gain(which, complex, geometry.IncidenceDegrees(column)), 6));
    return texts;
}

std::string OffsetText(const ProductOptions &options) {
    return ScientificText(options.lutOffset, 6);
}

std::vector<float> LookupTableGains(const ProductOptions &options,
                                    const std::string &kind) {
    std::vector<float> gains;
    for (const std::string &text : GainTexts(options, kind))
        gains.push_back(std::strtof(text.c_str(), nullptr));
    return gains;
}

float LookupTableOffset(const ProductOptions &options,
                        const std::string &kind) {
    KindOf(kind); // every kind has the same offset, but the kind must exist
    return std::strtof(OffsetText(options).c_str(), nullptr);
}

void WriteLookupTableFile(const std::string &path,
                          const ProductOptions &options,
                          const std::string &kind) {
    const std::string gains = JoinedBySpaces(GainTexts(options, kind));
    WriteTextFile(path, [&](std::ostream &out) {
        XmlWriter xml(out);
        xml.Open("lut", {{"copyright", "Synthetic test product"}});
        xml.Element("offset", OffsetText(options));
        xml.Element("gains", gains);
        xml.Close();
    });
}

NoiseProfile ReferenceNoiseLevels(const ProductOptions &options,
                                  const std::string &kind) {
    const Kind which = KindOf(kind);
    const SceneGeometry geometry(options);
    NoiseProfile profile{0, std::max(1, (options.width + 15) / 16), {}};
    for (int column = profile.firstPixel; column < options.width;
         column += profile.stepSize) {
        // The antenna pattern makes the noise floor a shallow bowl across
        // the swath; sigma and gamma rescale it like the backscatter.
        const double across = 2.0 * geometry.RangeFraction(column) - 1.0;
        const double theta =
            geometry.IncidenceDegrees(column) / degreesPerRadian;
        double level = -21.5 + 1.2 * across * across;
        if (which != Kind::Beta)
            level += 10.0 * std::log10(std::sin(theta));
        if (which == Kind::Gamma)
            level -= 10.0 * std::log10(std::cos(theta));
        profile.levels.push_back(level);
    }
    return profile;
}

} // namespace rs2gen
