#include "tools/rs2/Commands.hpp"

#include "host/Raster.hpp"

#include <cstdio>

void AddDriverCommand(CLI::App &app) {
    CLI::App *command =
        app.add_subcommand("driver", "Show the driver module the host loaded");
    command->footer("The host looks for the module in VXB_DRIVER_PATH (a file "
                    "or a folder), then beside its own library, then in the "
                    "install libdir.\nExample: VXB_DRIVER_PATH=build/lib "
                    "rs2 driver");
    command->callback([] {
        host::DriverInfo driver = host::LoadedDriver();
        std::printf("driver module: %s\n", driver.path.c_str());
        std::printf("registered operations (%zu):\n", driver.operations.size());
        for (const auto &[name, offset] : driver.operations)
            std::printf("  %4zu  %s\n", offset, name.c_str());
    });
}
