#pragma once

#include "host/Raster.hpp"

#include <string>

// A calibration asked for in the name ("?c=sigma", ":Calibration Type:Sigma
// Nought", --calibration) that the driver could not apply: the table is
// missing or unreadable, or the product is one the driver serves
// uncalibrated. The driver then warns and serves the samples as stored, and
// its metadata shows calibration "None". Commands that write calibrated
// values refuse such a dataset; commands that show it say so.
//
// Both functions read the host's warning log for the reason, so they are
// called right after the dataset is opened, before the log is cleared.

/// "Sigma Nought calibration not applied: REASON" when the name asked for a
/// calibration the dataset does not apply; "" otherwise.
std::string UnappliedCalibration(const host::Raster &raster);

/// Throws std::runtime_error with the text above, if there is one.
void RequireAppliedCalibration(const host::Raster &raster);
