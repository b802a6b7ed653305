#include "tools/rs2/Commands.hpp"
#include "tools/rs2/DatasetChoice.hpp"

#include "host/Raster.hpp"

#include <nlohmann/json.hpp>

#include <iostream>
#include <stdexcept>

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

void RunRead(const ReadOptions &options) {
    host::Raster raster = host::OpenRaster(options.name);
    host::Window window{options.window[0], options.window[1], options.window[2],
                        options.window[3]};
    int32_t width =
        options.bufferSize.empty() ? window.width : options.bufferSize[0];
    int32_t height =
        options.bufferSize.empty() ? window.height : options.bufferSize[1];
    const std::vector<int32_t> channels =
        ChosenChannels(raster, options.channels);
    int32_t type = raster.ChannelType(channels.front());
    // Real channels (4, 9) are read as floats, the others as integers,
    // unless the user chooses.
    bool real = options.real || (!options.integer && (type == 4 || type == 9));
    nlohmann::json result{{"type", type},
                          {"width", width},
                          {"height", height},
                          {"channels", channels}};
    if (real) {
        std::vector<float> data =
            raster.ReadReal32(window, width, height, channels);
        if (options.json) {
            result["data"] = data;
            std::cout << result.dump() << "\n";
        } else {
            PrintSamples(data, width, height,
                         data.size() / (static_cast<size_t>(width) * height));
        }
    } else {
        std::vector<int32_t> data =
            raster.ReadInt32(window, width, height, channels);
        if (options.json) {
            result["data"] = data;
            std::cout << result.dump() << "\n";
        } else {
            PrintSamples(data, width, height, channels.size());
        }
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
        ->check(CLI::PositiveNumber);
    command->add_option("--channels", options.channels, "e.g. 1,2")
        ->delimiter(',');
    auto *real =
        command->add_flag("--real", options.real, "read as 32-bit floats");
    command->add_flag("--int", options.integer, "read as 32-bit integers")
        ->excludes(real);
    command->add_flag("--json", options.json,
                      "print {type, width, height, channels, data}");
    command->footer("Prints one line per row, or with --json the buffer as "
                    "the driver wrote it.\nExamples:\n  rs2 read dir --window "
                    "0 0 4 3\n  rs2 read 'dir?c=sigma' --window 0 0 800 600 "
                    "--size 8 6 --json");
    command->callback([] { RunRead(options); });
}
