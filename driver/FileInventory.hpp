#pragma once

#include <cstdio>
#include <string>

/// The full-resolution image files named in the product description, as a
/// new host list (null when none).
char **ListImageFiles(FILE *handle);
/// The browse image path (its existence is not tested).
std::string BrowseImageFile(FILE *handle);
/// The look-up tables, calibration side file and readme that exist, as a
/// new host list (null when none).
char **ListAuxiliaryFiles(FILE *handle);
