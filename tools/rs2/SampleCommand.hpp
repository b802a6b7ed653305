#pragma once

#include <CLI/CLI.hpp>

/// Registers `rs2 sample DIR [options]`, which writes a synthetic product
/// folder with the product generator and prints the path of its
/// product.xml. Invalid option values fail the command line parse; a product
/// that cannot be written throws std::runtime_error from the parse.
void AddSampleCommand(CLI::App &app);
