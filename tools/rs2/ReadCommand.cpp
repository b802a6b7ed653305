#include "tools/rs2/CalibrationCheck.hpp"
#include "tools/rs2/Commands.hpp"
#include "tools/rs2/DatasetChoice.hpp"
#include "tools/rs2/JsonText.hpp"

#include "host/Raster.hpp"
#include "host/RasterServices.hpp"

#include <nlohmann/json.hpp>

#include <iostream>
#include <stdexcept>
#include <utility>

namespace {

struct ReadOptions {
    std::string name;
    std::vector<int32_t> window;     // x y w h
    std::vector<int32_t> bufferSize; // bw bh
    std::vector<int32_t> channels;
    bool real = false;
    bool integer = false;
    bool json = false;
};

template <typename Sample>
void PrintSamples(const std::vector<Sample> &data, int32_t width,
                  int32_t height, size_t perPixel) {
    for (int32_t y = 0; y < height; ++y) {
        for (int32_t x = 0; x < width; ++x)
            for (size_t s = 0; s < perPixel; ++s)
                std::cout
                    << (x || s ? " " : "")
                    << data[(static_cast<size_t>(y) * width + x) * perPixel +
                            s];
        std::cout << "\n";
    }
}

// Calibrated channels hold real samples, which the integer read leaves
// untouched: --int on them would print whatever the buffer held.
bool ReadsReals(const ReadOptions &options, int32_t type) {
    const bool calibrated = type == kChanFloat32 || type == kChanComplexFloat32;
    if (options.integer && calibrated)
        throw CLI::ValidationError(
            "--int", "the channels hold calibrated real samples; read them "
                     "without --int");
    return options.real || calibrated;
}

template <typename Sample>
void PrintRead(const ReadOptions &options, nlohmann::json result,
               const std::vector<Sample> &data, int32_t width, int32_t height) {
    if (options.json) {
        result["data"] = data;
        std::cout << JsonText(std::move(result)) << "\n";
    } else {
        PrintSamples(data, width, height,
                     data.size() / (static_cast<size_t>(width) * height));
    }
}

void RunRead(const ReadOptions &options) {
    host::Raster raster = OpenDataset(options.name);
    // Said once the read has succeeded, so that a failing read ends with
    // its one error line.
    const std::string unapplied = UnappliedCalibration(raster);
    const auto warnUnapplied = [&unapplied] {
        if (!unapplied.empty())
            std::cerr << "rs2: warning: " << unapplied << "\n";
    };
    ForgetOpenWarnings();
    const host::Window window = CheckedWindow(raster, options.window);
    const int32_t width =
        options.bufferSize.empty() ? window.width : options.bufferSize[0];
    const int32_t height =
        options.bufferSize.empty() ? window.height : options.bufferSize[1];
    const std::vector<int32_t> channels =
        ChosenChannels(raster, options.channels);
    const int32_t type = raster.ChannelType(channels.front());
    const nlohmann::json result{{"type", type},
                                {"width", width},
                                {"height", height},
                                {"channels", channels}};
    if (ReadsReals(options, type)) {
        const std::vector<float> data =
            raster.ReadReal32(window, width, height, channels);
        RequireCompleteReads();
        warnUnapplied();
        PrintRead(options, result, data, width, height);
    } else {
        const std::vector<int32_t> data =
            raster.ReadInt32(window, width, height, channels);
        RequireCompleteReads();
        warnUnapplied();
        PrintRead(options, result, data, width, height);
    }
}

} // namespace

void AddReadCommand(CLI::App &app) {
    static ReadOptions options;
    CLI::App *command = app.add_subcommand(
        "read", "Read a window of pixels (resampled to --size)");
    command->add_option("NAME", options.name, "dataset name")->required();
    command->add_option("--window", options.window, "X Y W H")
        ->expected(4)
        ->required();
    command->add_option("--size", options.bufferSize, "BW BH (output size)")
        ->expected(2)
        ->check(PositivePixels());
    command->add_option("--channels", options.channels, "e.g. 1,2")
        ->delimiter(',');
    auto *real =
        command->add_flag("--real", options.real, "read as 32-bit floats");
    command->add_flag("--int", options.integer, "read as 32-bit integers")
        ->excludes(real);
    command->add_flag("--json", options.json,
                      "print {type, width, height, channels, data}");
    command->footer("Prints one line per row, or with --json the buffer as "
                    "the driver wrote it. Calibrated channels are read as "
                    "floats, others as integers unless --real. A channel "
                    "whose image cannot be read fails the read; a "
                    "calibration that was asked for and cannot be applied "
                    "is told as a warning, and the stored samples are "
                    "printed.\nExamples:\n  rs2 read dir --window "
                    "0 0 4 3\n  rs2 read 'dir?c=sigma' --window 0 0 800 600 "
                    "--size 8 6 --json");
    command->callback([] { RunRead(options); });
}
