#include "tests/support/TempDir.hpp"

#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <vector>

namespace rs2test {

TempDir::TempDir() {
    std::string pattern =
        (std::filesystem::temp_directory_path() / "rs2test-XXXXXX").string();
    std::vector<char> buffer(pattern.begin(), pattern.end());
    buffer.push_back('\0');
    if (mkdtemp(buffer.data()) == nullptr)
        throw std::runtime_error("cannot create a temporary folder");
    path = buffer.data();
}

TempDir::~TempDir() {
    std::error_code ignored;
    std::filesystem::remove_all(path, ignored);
}

std::string TempDir::File(const std::string &name) const {
    return path + "/" + name;
}

} // namespace rs2test
