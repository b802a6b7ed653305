#include "tools/rs2/ExportPlan.hpp"

#include "host/RasterServices.hpp"
#include "tools/rs2/DatasetChoice.hpp"
#include "tools/rs2/NoiseLevels.hpp"

#include <CLI/CLI.hpp>

#include <regex>
#include <stdexcept>

namespace {

// Real channels keep their layout; integer ones are read as int32, and
// complex integers as words that pack the in-phase/quadrature int16 pair.
host::SampleType SampleTypeOf(int32_t typeCode) {
    switch (typeCode) {
    case kChanFloat32:
        return host::SampleType::Float32;
    case kChanComplexFloat32:
        return host::SampleType::ComplexFloat32;
    case kChanComplexInt16:
        return host::SampleType::ComplexInt16;
    case kChanInt32:
    case kChanUInt16:
    case kChanInt16:
    case kChanUInt8:
    case kChanUInt32:
        return host::SampleType::Int32;
    default:
        throw std::runtime_error("channels of type " +
                                 std::to_string(typeCode) +
                                 " cannot be exported");
    }
}

std::vector<int32_t> CheckedChannels(const host::Raster &raster,
                                     const std::vector<int32_t> &chosen) {
    const std::vector<int32_t> channels = ChosenChannels(raster, chosen);
    const int32_t type = raster.ChannelType(channels.front());
    for (int32_t channel : channels)
        if (raster.ChannelType(channel) != type)
            throw CLI::ValidationError(
                "--channels", "channels " + std::to_string(channels.front()) +
                                  " and " + std::to_string(channel) +
                                  " have different types; export them "
                                  "separately");
    return channels;
}

Looks ParsedLooks(const std::string &text) {
    static const std::regex form("([0-9]{1,9})x([0-9]{1,9})");
    std::smatch parts;
    Looks looks{0, 0};
    if (std::regex_match(text, parts, form))
        looks = {std::stoi(parts[1]), std::stoi(parts[2])};
    if (looks.lines < 1 || looks.columns < 1)
        throw CLI::ValidationError(
            "--looks", "\"" + text +
                           "\" is not AxR with A lines and R columns of at "
                           "least 1 each");
    return looks;
}

// A block larger than the grid would average nothing more, and the rows of
// one block are held in memory: so blocks fit the grid.
Looks LooksWithinGrid(const Looks &looks, const ExportPlan &plan) {
    if (looks.lines > plan.gridHeight || looks.columns > plan.gridWidth)
        throw CLI::ValidationError(
            "--looks",
            std::to_string(looks.lines) + "x" + std::to_string(looks.columns) +
                " blocks do not fit the " + std::to_string(plan.gridHeight) +
                " lines by " + std::to_string(plan.gridWidth) +
                " columns exported");
    return looks;
}

// The calibration the dataset applies, as product.xml names it; empty when
// it applies none.
std::string AppliedCalibration(const host::Raster &raster) {
    const std::string applied = MetadataValue(raster, "SAR_Calibration");
    if (applied == "Sigma0")
        return "Sigma Nought";
    if (applied == "Beta0")
        return "Beta Nought";
    if (applied == "Gamma")
        return "Gamma";
    return "";
}

// Complex samples are I/Q pairs; float channels are calibrated detected
// backscatter, which is power; integer channels are detected amplitudes.
PowerRule PowerRuleOf(host::SampleType readType) {
    if (readType == host::SampleType::ComplexFloat32 ||
        readType == host::SampleType::ComplexInt16)
        return PowerRule::ComplexPair;
    return readType == host::SampleType::Float32 ? PowerRule::AsIs
                                                 : PowerRule::Squared;
}

std::string JoinedLines(const std::vector<std::string> &lines) {
    std::string text;
    for (const std::string &line : lines)
        text += line + "\n";
    return text;
}

// The noise power at every grid column: grid column i samples window
// column window.x + floor(i * w / gridWidth), the host's rule.
std::vector<float> NoisePerGridColumn(const host::Raster &raster,
                                      const ExportPlan &plan) {
    const std::string calibration = AppliedCalibration(raster);
    if (calibration.empty())
        throw CLI::ValidationError(
            "--denoise", "the noise levels are calibrated backscatter: choose "
                         "a calibration (--calibration sigma|beta|gamma)");
    NoiseLevels levels;
    try {
        levels = ReadNoiseLevels(JoinedLines(raster.TextLines()), calibration);
    } catch (const std::runtime_error &error) {
        throw CLI::ValidationError("--denoise", error.what());
    }
    std::vector<float> noise(static_cast<size_t>(plan.gridWidth));
    for (int32_t i = 0; i < plan.gridWidth; ++i) {
        const int64_t column = plan.window.x + static_cast<int64_t>(i) *
                                                   plan.window.width /
                                                   plan.gridWidth;
        noise[static_cast<size_t>(i)] =
            static_cast<float>(levels.PowerAt(static_cast<double>(column)));
    }
    return noise;
}

void PlanBackscatter(const host::Raster &raster, const ExportOptions &options,
                     ExportPlan &plan) {
    if (options.clamp && !options.denoise)
        throw CLI::ValidationError("--clamp", "only applies with --denoise");
    if (!options.looks.empty() && !options.bufferSize.empty())
        throw CLI::ValidationError(
            "--looks", "--looks and --size both set the output size; give "
                       "one of them");
    plan.backscatter =
        options.decibels || options.denoise || !options.looks.empty();
    if (!plan.backscatter)
        return;
    if (!options.looks.empty())
        plan.looks = LooksWithinGrid(ParsedLooks(options.looks), plan);
    plan.powerRule = PowerRuleOf(plan.readType);
    if (options.denoise)
        plan.noise = NoisePerGridColumn(raster, plan);
    plan.clamp = options.clamp;
    plan.decibels = options.decibels;
    plan.width = LookedSize(plan.gridWidth, plan.looks.columns);
    plan.height = LookedSize(plan.gridHeight, plan.looks.lines);
    plan.sampleType = host::SampleType::Float32;
}

} // namespace

ExportPlan PlanExport(const host::Raster &raster,
                      const ExportOptions &options) {
    RequirePixels(raster, "export");
    ExportPlan plan;
    plan.window = CheckedWindow(raster, options.window);
    plan.gridWidth =
        options.bufferSize.empty() ? plan.window.width : options.bufferSize[0];
    plan.gridHeight =
        options.bufferSize.empty() ? plan.window.height : options.bufferSize[1];
    plan.channels = CheckedChannels(raster, options.channels);
    plan.readType = SampleTypeOf(raster.ChannelType(plan.channels.front()));
    plan.width = plan.gridWidth;
    plan.height = plan.gridHeight;
    plan.sampleType = plan.readType;
    PlanBackscatter(raster, options, plan);
    return plan;
}
