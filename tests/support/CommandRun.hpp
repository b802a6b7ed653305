#pragma once

#include <string>
#include <vector>

namespace rs2test {

struct CommandResult {
    int exitCode;       // -1 when the command did not exit normally
    std::string output; // standard output
    std::string errors; // standard error
};

/// Text quoted for the shell (the text holds no single quote).
std::string Quoted(const std::string &text);

/// Runs a shell command line; its standard error goes to a file of a scratch
/// folder of its own (so that output folders hold only what the command
/// wrote) and is read back.
CommandResult RunShell(const std::string &line);

/// The whole content of a file; empty when it cannot be read.
std::string FileText(const std::string &path);

/// Names of the entries of a folder.
std::vector<std::string> FolderEntries(const std::string &folder);

} // namespace rs2test
