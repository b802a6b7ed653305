#pragma once

#include "tests/support/CommandRun.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <map>
#include <string>
#include <vector>

namespace rs2test {

/// Size of the valid product a broken case starts from.
constexpr int kCaseWidth = 16;  // pixels
constexpr int kCaseHeight = 12; // lines

/// How one rs2 command must end: its exit code and a text its one error
/// line (exit 1 or 2) or its standard output (exit 0) holds; "" holds
/// anywhere.
struct Outcome {
    int exitCode = 0;
    std::string text;
};

/// The commands every case is run through, in this order.
const std::vector<std::string> &CatalogueCommands();

/// One line of the catalogue of broken products.
struct BrokenCase {
    std::string name;   // the case's folder in the catalogue
    std::string breaks; // what it breaks, for people
    /// Per command of CatalogueCommands. A line must give info and export;
    /// text and segments end as info does, quicklook and read as export
    /// does, unless the line gives them.
    std::map<std::string, Outcome> outcomes;
};

/// The cases of the manifest at path ("name | breaks | info E TEXT; export E
/// TEXT[; COMMAND E TEXT ...]" lines, '#' comments); throws
/// std::runtime_error naming a line that does not read so.
std::vector<BrokenCase> ReadCatalogue(const std::string &path);

/// Runs the rs2 tool with arguments (quoted for the shell) in 1 GiB of
/// address space (unless sanitized), ended by force after a generous limit: a
/// run that hangs fails, with exit code 124, and one ended by a signal gets a
/// code above 128.
CommandResult RunRs2(const std::string &arguments);

/// Checks a run against an outcome: exit 1 or 2 with exactly one line on
/// stderr, "rs2: " and the text; or exit 0, at most warnings ("rs2:
/// warning: " lines) on stderr and the text in the standard output.
void ExpectOutcome(const CommandResult &run, const Outcome &expected);

/// The options of the valid product every case starts from.
rs2gen::ProductOptions CaseOptions();

/// Writes the valid product into root/name and copies the files of the
/// catalogue's folder name over it; gives the product folder.
std::string PrepareCase(const std::string &catalogue, const std::string &name,
                        const std::string &root);

} // namespace rs2test
