#pragma once

#include <fstream>
#include <string>

// Reading a file back: FileText of CommandRun.hpp.

namespace rs2test {

/// Writes text to path byte for byte, replacing what was there; gives path.
inline std::string WriteFile(const std::string &path, const std::string &text) {
    std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
    return path;
}

} // namespace rs2test
