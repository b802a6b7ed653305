#include "tools/rs2/Commands.hpp"
#include "tools/rs2/DatasetChoice.hpp"

#include "host/Raster.hpp"

#include <cstdio>

void AddTextCommands(CLI::App &app) {
    static std::string textName;
    CLI::App *text = app.add_subcommand(
        "text", "Print the product annotation segment line by line");
    text->add_option("NAME", textName, "dataset name")->required();
    text->footer("Example: rs2 text dir/product.xml | grep noiseLevelValues");
    text->callback([] {
        host::Raster raster = OpenDataset(textName);
        for (const std::string &line : raster.TextLines())
            std::printf("%s\n", line.c_str());
    });

    static std::string segmentsName;
    CLI::App *segments =
        app.add_subcommand("segments", "List the segments of a dataset");
    segments->add_option("NAME", segmentsName, "dataset name")->required();
    segments->footer("Prints one line per segment: type, number, "
                     "description.\nExample: rs2 segments dir");
    segments->callback([] {
        host::Raster raster = OpenDataset(segmentsName);
        for (const host::Segment &segment : raster.Segments())
            std::printf("%d %d %s\n", segment.type, segment.number,
                        segment.description.c_str());
    });
}
