#pragma once

#include <string>

// An output under construction: OUT.part-XXXXXX beside OUT, so that the final
// rename stays within one file system and OUT is either the old file or the
// complete new one. The part is removed unless committed, also when the
// process ends on SIGINT, SIGTERM or SIGHUP. One part file at a time.
class PartFile {
  public:
    explicit PartFile(const std::string &target);
    ~PartFile();
    PartFile(const PartFile &) = delete;
    PartFile &operator=(const PartFile &) = delete;

    const std::string &Path() const { return path; }

    // Renames the part to the target; throws when that fails.
    void Commit();

  private:
    std::string target;
    std::string path;
    bool committed = false;
};
