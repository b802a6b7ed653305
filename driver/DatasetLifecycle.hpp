#pragma once

#include <cstdio>

/// Opens the product a dataset name designates; the new handle, or null.
/// Throws orv::Exception for an invalid calibration choice and passes on the
/// loader's exceptions.
FILE *OpenDataset(const char *name, const char *access);
/// Closes a handle of this driver; unknown handles are left alone.
void CloseDataset(FILE *handle);
