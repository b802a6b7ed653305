#include "fuzz/FolderArchive.hpp"

#include <filesystem>
#include <fstream>
#include <string_view>
#include <system_error>

namespace rs2fuzz {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view kFileMark = "\n@@ ";
constexpr std::string_view kLinkMark = "\n@@> ";
// More files than a product has only slow every input down.
constexpr int kMaxEntries = 16;

// A name usable as one component of a path inside the folder; empty when
// there is none.
std::string Component(std::string_view text) {
    std::string name(text);
    for (char &c : name)
        if (c == '/' || c == '\0')
            c = '_';
    if (name == "." || name == "..")
        return std::string();
    return name;
}

void WriteEntry(const fs::path &folder, std::string_view entry, bool link) {
    const std::size_t end = entry.find('\n');
    const std::string name = Component(entry.substr(0, end));
    if (name.empty())
        return;
    const std::string_view body = end == std::string_view::npos
                                      ? std::string_view()
                                      : entry.substr(end + 1);
    std::error_code ignored;
    fs::remove(folder / name, ignored);
    if (link) {
        fs::create_symlink(std::string(body.substr(0, body.find('\n'))),
                           folder / name, ignored);
        return;
    }
    std::ofstream out(folder / name, std::ios::binary);
    out.write(body.data(), static_cast<std::streamsize>(body.size()));
}

} // namespace

std::string UnpackProductFolder(const std::string &root, const uint8_t *data,
                                size_t size) {
    const std::string_view input(reinterpret_cast<const char *>(data), size);
    std::error_code ignored;
    for (const auto &entry : fs::directory_iterator(root, ignored))
        fs::remove_all(entry.path(), ignored);
    std::size_t mark = input.find(kFileMark.substr(0, 3));
    std::string folderName = Component(input.substr(0, mark));
    const fs::path folder =
        fs::path(root) / (folderName.empty() ? "product" : folderName);
    fs::create_directory(folder, ignored);
    for (int entries = 0;
         mark != std::string_view::npos && entries < kMaxEntries; ++entries) {
        const bool link = input.compare(mark, kLinkMark.size(), kLinkMark) == 0;
        const std::size_t start =
            mark + (link ? kLinkMark.size() : kFileMark.size());
        if (start > input.size())
            break;
        const std::size_t next = input.find(kFileMark.substr(0, 3), start);
        WriteEntry(folder, input.substr(start, next - start), link);
        mark = next;
    }
    return folder.string();
}

} // namespace rs2fuzz
