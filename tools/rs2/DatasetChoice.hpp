#pragma once

#include "host/Raster.hpp"

#include <CLI/CLI.hpp>

#include <cstdint>
#include <string>
#include <vector>

// What the commands that read pixels share: a calibration chosen by option
// rather than in the name, and a checked list of channels.

// Adds --calibration sigma|beta|gamma to a command.
void AddCalibrationOption(CLI::App *command, std::string &calibration);

// The dataset name that opens `name` calibrated as chosen: `name` itself when
// nothing is chosen, else with the choice as its query ("?c=sigma" or
// "&c=sigma"). A name that already chooses a calibration cannot take a second
// choice (CLI::ValidationError).
std::string NameWithCalibration(const std::string &name,
                                const std::string &calibration);

// The channels asked for, all of them when none is; a channel the dataset
// lacks is a CLI::ValidationError of `option`.
std::vector<int32_t> ChosenChannels(const host::Raster &raster,
                                    std::vector<int32_t> channels,
                                    const std::string &option = "--channels");

// Pixels the driver cannot read (an image file that is missing, or is not an
// image) stay as they were in the buffer, and the host logs a warning. A
// command that writes a file from its reads forgets the open's warnings once
// opened (ForgetOpenWarnings) and calls RequireCompleteReads after reading,
// so that it fails rather than pass zeros off as the product's pixels.
void ForgetOpenWarnings();
void RequireCompleteReads();
