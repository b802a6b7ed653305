#include "tools/rs2/Commands.hpp"

#include "host/Raster.hpp"

#include <cstdio>
#include <exception>
#include <iostream>

int main(int argc, char **argv) {
    CLI::App app{"rs2: inspect, read and export RADARSAT-2 products"};
    app.set_version_flag("--version", std::string("rs2 ") + RS2_VERSION);
    app.require_subcommand(1);
    app.footer(
        "Run rs2 COMMAND --help for the options and examples of a "
        "command.\nExamples:\n  rs2 info dir\n  rs2 export dir "
        "sigma0_db.tif --calibration sigma --denoise --db\n  rs2 "
        "quicklook dir preview.png\n  rs2 footprint dir > scene.geojson");
    AddInfoCommand(app);
    AddReadCommand(app);
    AddExportCommand(app);
    AddTextCommands(app);
    AddDriverCommand(app);
    AddSampleCommand(app);
    AddQuicklookCommand(app);
    AddFootprintCommand(app);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError &error) {
        // Help and version are successes; any other parse error is bad
        // usage, told in one line.
        if (error.get_exit_code() == 0)
            return app.exit(error);
        std::cerr << "rs2: " << error.what() << "\n";
        return 2;
    } catch (const std::exception &error) {
        std::cerr << "rs2: " << error.what() << "\n";
        return 1;
    }
    return 0;
}
