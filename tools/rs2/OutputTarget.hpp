#pragma once

#include "host/Raster.hpp"

#include <string>
#include <sys/types.h>
#include <vector>

// Where a command may put its output. The output is renamed over its target,
// which replaces whatever the name held: so a target must be absent or a
// regular file we may write, and none of the files the dataset is read from
// (compared by device and inode, so that another name or a hard link of an
// image is caught as well). Symbolic links are refused rather than followed:
// the rename would replace the link, not the file it points to.

struct DatasetFile {
    std::string path;
    dev_t device;
    ino_t inode;
};

/// The dataset's files that exist: its product description, images, browse
/// image, look-up tables and side files.
std::vector<DatasetFile> DatasetFiles(const host::Raster &raster);

/// Throws std::runtime_error "cannot write TARGET: REASON" unless target may
/// be created or replaced.
void RequireReplaceableTarget(const std::string &target,
                              const std::vector<DatasetFile> &datasetFiles);
