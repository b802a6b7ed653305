#include "tools/rs2/Commands.hpp"

#include "tools/rs2/DatasetJson.hpp"

#include <cstdio>
#include <iostream>

namespace {

void PrintSummary(const nlohmann::json &info) {
    std::printf("%s\n", info["name"].get<std::string>().c_str());
    std::printf("  %s, %d x %d pixels, %zu channel(s)\n",
                info["object_name"].get<std::string>().c_str(),
                info["width"].get<int>(), info["height"].get<int>(),
                info["channels"].size());
    for (const auto &channel : info["channels"])
        std::printf("  channel %d: type %d, %s\n", channel["number"].get<int>(),
                    channel["type"].get<int>(),
                    channel["description"].get<std::string>().c_str());
    std::printf("  projection: %s\n",
                info["projection"]["geosys"].get<std::string>().c_str());
    std::printf("  ground control points: %zu\n",
                info["gcps"]["points"].size());
    for (const auto &segment : info["segments"])
        std::printf("  segment %d/%d: %s\n", segment["type"].get<int>(),
                    segment["number"].get<int>(),
                    segment["description"].get<std::string>().c_str());
    std::printf("  metadata entries: %zu\n", info["metadata"].size());
    for (const auto &warning : info["warnings"])
        std::printf("  warning: %s\n", warning.get<std::string>().c_str());
}

} // namespace

void AddInfoCommand(CLI::App &app) {
    CLI::App *command = app.add_subcommand(
        "info", "Describe a dataset: size, channels, metadata, segments");
    static std::string name;
    static bool asJson = false;
    command->add_option("NAME", name, "dataset name (product.xml, ...)")
        ->required();
    command->add_flag("--json", asJson, "print one JSON object");
    command->callback([] {
        host::Raster raster = host::OpenRaster(name);
        nlohmann::json info = DescribeDataset(raster);
        if (asJson)
            std::cout << info.dump(2) << "\n";
        else
            PrintSummary(info);
    });
}
