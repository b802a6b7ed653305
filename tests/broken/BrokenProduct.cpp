#include "tests/broken/BrokenProduct.hpp"

#include <boost/algorithm/string/trim.hpp>
#include <gtest/gtest.h>

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
Outcome ReadOutcome(const std::string &text, const std::string &command,
                    const std::string &line) {
    std::istringstream words(text);
    std::string name;
    Outcome outcome;
    if (!(words >> name >> outcome.exitCode) || name != command)
        throw std::runtime_error("no \"" + command + " EXIT\" in: " + line);
    std::getline(words, outcome.text);
    boost::algorithm::trim(outcome.text);
    return outcome;
}

} // namespace

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
        const std::vector<std::string> outcomes =
            fields.size() == 3 ? Fields(fields[2], ';')
                               : std::vector<std::string>{};
        if (outcomes.size() != 2)
            throw std::runtime_error("not \"name | breaks | info ...; "
                                     "export ...\": " +
                                     line);
        cases.push_back({fields[0], fields[1],
                         ReadOutcome(outcomes[0], "info", line),
                         ReadOutcome(outcomes[1], "export", line)});
    }
    return cases;
}

CommandResult RunRs2(const std::string &arguments) {
    return RunShell("timeout 120 " + Quoted(RS2_TOOL) + " " + arguments);
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
    fs::copy(fs::path(catalogue) / name, folder,
             fs::copy_options::recursive |
                 fs::copy_options::overwrite_existing);
    return folder.string();
}

} // namespace rs2test
