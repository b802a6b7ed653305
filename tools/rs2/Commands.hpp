#pragma once

#include <CLI/CLI.hpp>

// Each subcommand of rs2 registers itself on the application; its callback
// does the work and throws std::runtime_error (exit 1) on failure.

void AddInfoCommand(CLI::App &app);
void AddReadCommand(CLI::App &app);
void AddExportCommand(CLI::App &app);
void AddTextCommands(CLI::App &app);
void AddDriverCommand(CLI::App &app);
void AddSampleCommand(CLI::App &app);
void AddQuicklookCommand(CLI::App &app);
void AddFootprintCommand(CLI::App &app);
