#pragma once

#include "host/Raster.hpp"

#include <string>
#include <vector>

// The file behind a dataset name. A name is a path, or a path with a
// calibration choice ("dir/product.xml?c=sigma", "dir/product.xml:Calibration
// Type:Sigma Nought"), or a file:// URI; the choice is no part of the file.

/// The path of the file (or folder) name names: the name without its query
/// or ":Calibration Type:" part; for a file:// URI its decoded path. "" for
/// a URI of another scheme, whose file the tool cannot tell.
std::string FilePartOf(const std::string &name);

/// Throws std::runtime_error "cannot open PATH: no such file" when the name
/// names nothing: neither the name as a whole nor its file part exists.
void RequireExistingFile(const std::string &name);

/// The path with runs of '/' and "/./" steps collapsed ("dir///file" reads
/// "dir/file"); ".." steps stay, as they may pass through symbolic links.
std::string TidyPath(const std::string &path);

/// A lookupTable element of product.xml: its attribute text (the kind,
/// "Sigma Nought") and the table's file name as written.
struct LookupTableName {
    std::string attributes;
    std::string fileName;
};

/// The look-up tables the dataset's product.xml names.
std::vector<LookupTableName> LookupTableNames(const host::Raster &raster);
