#pragma once

#include "tools/rs2/OutputTarget.hpp"

#include <string>
#include <vector>

// An output under construction: OUT.part-XXXXXX beside OUT, so that the final
// rename stays within one file system and OUT is either the old file or the
// complete new one. The target is checked (RequireReplaceableTarget) when the
// part is made and again right before the rename. The part is removed unless
// committed, also when the process ends on a signal: any signal whose default
// is to end the process, faults included, except those ignored when the part
// was made. One part file at a time.
class PartFile {
  public:
    /// Throws std::runtime_error when target may not be written.
    PartFile(const std::string &target, std::vector<DatasetFile> datasetFiles);
    ~PartFile();
    PartFile(const PartFile &) = delete;
    PartFile &operator=(const PartFile &) = delete;

    const std::string &Path() const { return path; }

    /// Renames the part to the target; throws when that fails or the target
    /// may no longer be replaced.
    void Commit();

  private:
    std::string target;
    std::vector<DatasetFile> datasetFiles;
    std::string path;
    bool committed = false;
};
