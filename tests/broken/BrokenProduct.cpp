#include "tests/broken/BrokenProduct.hpp"

#include <boost/algorithm/string/trim.hpp>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>

namespace rs2test {
namespace {

namespace fs = std::filesystem;

// The fields of text between separators, trimmed.
std::vector<std::string> Fields(const std::string &text, char separator) {
    std::vector<std::string> fields;
    std::istringstream stream(text);
    for (std::string field; std::getline(stream, field, separator);)
        fields.push_back(boost::algorithm::trim_copy(field));
    return fields;
}

// "info 0 some text": the command's name, its exit code and the text.
std::pair<std::string, Outcome> ReadOutcome(const std::string &text,
                                            const std::string &line) {
    std::istringstream words(text);
    std::string name;
    Outcome outcome;
    const auto &commands = CatalogueCommands();
    if (!(words >> name >> outcome.exitCode) ||
        std::find(commands.begin(), commands.end(), name) == commands.end())
        throw std::runtime_error("no \"COMMAND EXIT\" in: " + line);
    std::getline(words, outcome.text);
    boost::algorithm::trim(outcome.text);
    return {name, outcome};
}

// The commands a line need not give end with the exit code of the one they
// resemble: text and segments read only the description, as info does;
// read and quicklook need the pixels, as export does.
void CompleteOutcomes(std::map<std::string, Outcome> &outcomes,
                      const std::string &line) {
    if (outcomes.count("info") == 0 || outcomes.count("export") == 0)
        throw std::runtime_error("no info or export outcome in: " + line);
    for (const char *command : {"text", "segments"})
        outcomes.emplace(command, Outcome{outcomes["info"].exitCode, ""});
    for (const char *command : {"read", "quicklook"})
        outcomes.emplace(command, Outcome{outcomes["export"].exitCode, ""});
}

// Small products must be served in bounded memory whatever they declare.
// The sanitizers reserve terabytes of address space, so their builds run
// without the bound.
std::string MemoryBound() {
#if defined(__SANITIZE_ADDRESS__)
    return "";
#else
    return "prlimit --as=" + std::to_string(std::int64_t{1} << 30) + " ";
#endif
}

} // namespace

const std::vector<std::string> &CatalogueCommands() {
    static const std::vector<std::string> commands = {
        "info", "export", "quicklook", "read", "text", "segments"};
    return commands;
}

std::vector<BrokenCase> ReadCatalogue(const std::string &path) {
    std::ifstream manifest(path);
    if (!manifest)
        throw std::runtime_error("cannot read " + path);
    std::vector<BrokenCase> cases;
    std::string line;
    while (std::getline(manifest, line)) {
        if (line.empty() || line[0] == '#')
            continue;
        const std::vector<std::string> fields = Fields(line, '|');
        if (fields.size() != 3)
            throw std::runtime_error("not \"name | breaks | outcomes\": " +
                                     line);
        BrokenCase c{fields[0], fields[1], {}};
        for (const std::string &outcome : Fields(fields[2], ';'))
            c.outcomes.insert(ReadOutcome(outcome, line));
        CompleteOutcomes(c.outcomes, line);
        cases.push_back(std::move(c));
    }
    return cases;
}

CommandResult RunRs2(const std::string &arguments) {
    return RunShell(MemoryBound() + "timeout 120 " + Quoted(RS2_TOOL) + " " +
                    arguments);
}

void ExpectOutcome(const CommandResult &run, const Outcome &expected) {
    ASSERT_EQ(run.exitCode, expected.exitCode)
        << "stderr: " << run.errors << "stdout: " << run.output;
    if (expected.exitCode == 0) {
        // A success may warn, in one line (a calibration it cannot apply).
        if (!run.errors.empty()) {
            EXPECT_EQ(run.errors.rfind("rs2: warning: ", 0), 0u) << run.errors;
            EXPECT_EQ(run.errors.find('\n'), run.errors.size() - 1)
                << run.errors;
        }
        EXPECT_NE(run.output.find(expected.text), std::string::npos)
            << run.output;
        return;
    }
    EXPECT_EQ(run.errors.rfind("rs2: ", 0), 0u) << run.errors;
    EXPECT_EQ(run.errors.find('\n'), run.errors.size() - 1) << run.errors;
    EXPECT_NE(run.errors.find(expected.text), std::string::npos) << run.errors;
}

rs2gen::ProductOptions CaseOptions() {
    rs2gen::ProductOptions options;
    options.width = kCaseWidth;
    options.height = kCaseHeight;
    return options;
}

std::string PrepareCase(const std::string &catalogue, const std::string &name,
                        const std::string &root) {
    const fs::path folder = fs::path(root) / name;
    rs2gen::GenerateProduct(folder.string(), CaseOptions());
    // Links are copied as links: where they lead is what a case tests.
    const fs::path source = fs::path(catalogue) / name;
    for (const auto &entry : fs::recursive_directory_iterator(source)) {
        const fs::path target =
            folder / entry.path().lexically_relative(source);
        if (entry.is_symlink()) {
            fs::remove(target);
            fs::copy_symlink(entry.path(), target);
        } else if (entry.is_directory()) {
            fs::create_directories(target);
        } else {
            fs::copy_file(entry.path(), target,
                          fs::copy_options::overwrite_existing);
        }
    }
    return folder.string();
}

} // namespace rs2test
