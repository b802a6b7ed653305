#pragma once

#include <cstdio>
#include <map>

class DatasetEntry;

/// The process-wide map from host handle (compared by address) to the record
/// of an open dataset. Used without locks: the host calls one at a time.
std::map<FILE *, DatasetEntry *> &OpenDatasets();

/// The entry registered for exactly this handle, or null.
DatasetEntry *FindDatasetEntry(FILE *handle);
