#pragma once

#include "host/Raster.hpp"

#include <CLI/CLI.hpp>

#include <cstdint>
#include <string>
#include <vector>

// What the commands that read pixels share: a calibration chosen by option
// rather than in the name, checked channels, windows and sizes.

/// Opens the dataset a command names; a name whose file does not exist
/// fails as "cannot open PATH: no such file".
host::Raster OpenDataset(const std::string &name);

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

/// Throws std::runtime_error "the dataset has no pixels to PURPOSE" for a
/// dataset of no pixels (no polarization, its first image missing).
void RequirePixels(const host::Raster &raster, const std::string &purpose);

/// The window --window gives (x y w h), the whole raster when none is given;
/// a window that does not lie within the raster is a CLI::ValidationError of
/// `option`. Commands check windows before they allocate for them.
host::Window CheckedWindow(const host::Raster &raster,
                           const std::vector<int32_t> &window,
                           const std::string &option = "--window");

/// Checks a count of pixels (--size): a whole number of at least 1.
CLI::Validator PositivePixels();

/// The value of a metadata entry of the dataset; "" when it has none.
std::string MetadataValue(const host::Raster &raster, const std::string &key);

// Pixels the driver cannot read (an image file that is missing, or is not an
// image) stay as they were in the buffer, and the host logs a warning. A
// command that writes a file from its reads forgets the open's warnings once
// opened (ForgetOpenWarnings) and calls RequireCompleteReads after reading,
// so that it fails rather than pass zeros off as the product's pixels.
void ForgetOpenWarnings();
void RequireCompleteReads();
