#include "tools/rs2/DatasetChoice.hpp"

#include "tools/rs2/DatasetPaths.hpp"

#include "host/ErrorReports.hpp"

#include <algorithm>
#include <cctype>
#include <cstdint>
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

host::Raster OpenDataset(const std::string &name) {
    RequireExistingFile(name);
    return host::OpenRaster(name);
}

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

void RequirePixels(const host::Raster &raster, const std::string &purpose) {
    if (raster.Width() < 1 || raster.Height() < 1 || raster.ChannelCount() < 1)
        throw std::runtime_error("the dataset has no pixels to " + purpose +
                                 " (" + std::to_string(raster.Width()) + " x " +
                                 std::to_string(raster.Height()) + ", " +
                                 std::to_string(raster.ChannelCount()) +
                                 " channels)");
}

host::Window CheckedWindow(const host::Raster &raster,
                           const std::vector<int32_t> &w,
                           const std::string &option) {
    if (w.empty())
        return {0, 0, raster.Width(), raster.Height()};
    if (w[2] < 1 || w[3] < 1)
        throw CLI::ValidationError(option,
                                   "width and height must be at least 1");
    if (w[0] < 0 || w[1] < 0 || w[2] > raster.Width() - w[0] ||
        w[3] > raster.Height() - w[1])
        throw CLI::ValidationError(
            option,
            "window " + std::to_string(w[0]) + " " + std::to_string(w[1]) +
                " " + std::to_string(w[2]) + " " + std::to_string(w[3]) +
                " does not lie within the " + std::to_string(raster.Width()) +
                " x " + std::to_string(raster.Height()) + " raster");
    return {w[0], w[1], w[2], w[3]};
}

CLI::Validator PositivePixels() {
    return CLI::Validator(
        [](const std::string &text) {
            long long value = 0;
            size_t used = 0;
            try {
                value = std::stoll(text, &used);
            } catch (const std::exception &) {
                used = 0;
            }
            if (used == text.size() && used > 0 && value >= 1 &&
                value <= INT32_MAX)
                return std::string();
            return "\"" + text +
                   "\" is no size: give whole pixels of at least 1";
        },
        "PIXELS");
}

std::string MetadataValue(const host::Raster &raster, const std::string &key) {
    for (const auto &[entryKey, value] : raster.Metadata(1))
        if (entryKey == key)
            return value;
    return "";
}

void ForgetOpenWarnings() { host::ClearWarnings(); }

void RequireCompleteReads() {
    const std::vector<std::string> warnings = host::Warnings();
    if (!warnings.empty())
        throw std::runtime_error("not every pixel could be read: " +
                                 warnings.front());
}
