#pragma once

#include <string>

namespace rs2test {

/// A fresh folder under the system's temporary directory, removed with all
/// its contents when the keeper goes out of scope.
class TempDir {
  public:
    TempDir();
    ~TempDir();
    TempDir(const TempDir &) = delete;
    TempDir &operator=(const TempDir &) = delete;

    const std::string &Path() const { return path; }
    /// Path of a file inside the folder.
    std::string File(const std::string &name) const;

  private:
    std::string path;
};

} // namespace rs2test
