#pragma once

#include "host/fileio/File.hpp"

#include <string>

/// Rewrites a dataset name into its canonical form; a new host string the
/// caller frees.
char *NormalizeDatasetName(const char *name);
/// The file a dataset name designates; throws orv::Exception "Could not
/// parse filename" when there is none.
orv::core::fileio::File ParseFileName(const std::string &name);
/// "Sigma Nought" -> "Sigma", "beta nought" -> "Beta", "None" -> "none".
std::string NormalizeCalibrationName(const std::string &text);
