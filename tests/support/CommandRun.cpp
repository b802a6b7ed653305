#include "tests/support/CommandRun.hpp"

#include "tests/support/TempDir.hpp"

#include <array>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <sys/wait.h>

namespace rs2test {

std::string Quoted(const std::string &text) { return "'" + text + "'"; }

std::string FileText(const std::string &path) {
    std::ifstream file(path, std::ios::binary);
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
}

CommandResult RunShell(const std::string &line) {
    static const TempDir scratch;
    const std::string errors = scratch.File("stderr.txt");
    const std::string command = "{ " + line + "; } 2>" + Quoted(errors);
    FILE *pipe = popen(command.c_str(), "r");
    if (pipe == nullptr)
        return {-1, "", ""};
    std::string output;
    std::array<char, 4096> chunk{};
    size_t read = 0;
    while ((read = std::fread(chunk.data(), 1, chunk.size(), pipe)) > 0)
        output.append(chunk.data(), read);
    const int status = pclose(pipe);
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, output,
            FileText(errors)};
}

std::vector<std::string> FolderEntries(const std::string &folder) {
    std::vector<std::string> names;
    for (const auto &entry : std::filesystem::directory_iterator(folder))
        names.push_back(entry.path().filename().string());
    return names;
}

} // namespace rs2test
