#include "tools/rs2/DatasetChoice.hpp"

#include "host/ErrorReports.hpp"

#include <algorithm>
#include <cctype>
#include <numeric>
#include <stdexcept>

namespace {

std::string LowerCase(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(),
                   [](unsigned char c) { return std::tolower(c); });
    return text;
}

// A name chooses a calibration by a "c" query member or by the
// ":Calibration Type:" suffix.
bool ChoosesCalibration(const std::string &name) {
    const std::string lower = LowerCase(name);
    const size_t query = lower.find('?');
    if (query != std::string::npos) {
        const std::string members = "&" + lower.substr(query + 1);
        if (members.find("&c=") != std::string::npos)
            return true;
    }
    return lower.find(":calibration type:") != std::string::npos;
}

} // namespace

void AddCalibrationOption(CLI::App *command, std::string &calibration) {
    command
        ->add_option("--calibration", calibration,
                     "sigma, beta or gamma (default: as the name chooses; "
                     "uncalibrated without a choice)")
        ->check(CLI::IsMember({"sigma", "beta", "gamma"}, CLI::ignore_case));
}

std::string NameWithCalibration(const std::string &name,
                                const std::string &calibration) {
    if (calibration.empty())
        return name;
    if (ChoosesCalibration(name))
        throw CLI::ValidationError(
            "--calibration", "the name " + name +
                                 " already chooses a calibration; give one "
                                 "choice only");
    const char separator = name.find('?') == std::string::npos ? '?' : '&';
    return name + separator + "c=" + LowerCase(calibration);
}

std::vector<int32_t> ChosenChannels(const host::Raster &raster,
                                    std::vector<int32_t> channels,
                                    const std::string &option) {
    if (channels.empty()) {
        channels.resize(raster.ChannelCount());
        std::iota(channels.begin(), channels.end(), 1);
    }
    for (int32_t channel : channels)
        if (channel < 1 || channel > raster.ChannelCount())
            throw CLI::ValidationError(
                option, "channel " + std::to_string(channel) +
                            " does not exist (the dataset has " +
                            std::to_string(raster.ChannelCount()) + ")");
    return channels;
}

void ForgetOpenWarnings() { host::ClearWarnings(); }

void RequireCompleteReads() {
    const std::vector<std::string> warnings = host::Warnings();
    if (!warnings.empty())
        throw std::runtime_error("not every pixel could be read: " +
                                 warnings.front());
}
