#include "fuzz/FuzzDrivers.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

// One folder per fuzz target, named after it, holding the inputs on which
// the target once crashed, hung or ran out of memory.
const fs::path kRegressions = RS2_SOURCE_DIR "/tests/data/fuzz-regressions";

std::vector<fs::path> SortedEntries(const fs::path &folder) {
    std::vector<fs::path> entries(fs::directory_iterator(folder), {});
    std::sort(entries.begin(), entries.end());
    return entries;
}

std::vector<uint8_t> ReadBytes(const fs::path &path) {
    std::ifstream in(path, std::ios::binary);
    return std::vector<uint8_t>(std::istreambuf_iterator<char>(in), {});
}

TEST(FuzzRegressions, every_stored_finding_ends_in_a_defined_outcome) {
    size_t replayed = 0;
    for (const fs::path &folder : SortedEntries(kRegressions)) {
        const rs2fuzz::Target *target =
            rs2fuzz::FindTarget(folder.filename().string());
        ASSERT_NE(target, nullptr) << "no fuzz target for " << folder;
        for (const fs::path &input : SortedEntries(folder)) {
            SCOPED_TRACE(input.string());
            const std::vector<uint8_t> bytes = ReadBytes(input);
            const rs2fuzz::Outcome outcome =
                target->run(bytes.data(), bytes.size());
            // Turned away, an input must say why.
            EXPECT_TRUE(outcome.accepted || !outcome.error.empty());
            ++replayed;
        }
    }
    EXPECT_GT(replayed, 0u);
}

} // namespace
