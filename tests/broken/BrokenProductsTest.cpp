// The catalogue of broken products (tests/data/broken/cases.txt) run through
// the rs2 tool, and the inputs too large to keep in the repository made here.

#include "tests/broken/BrokenProduct.hpp"

#include "host/RasterServices.hpp"

#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <map>
#include <set>
#include <sstream>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

using rs2test::BrokenCase;
using rs2test::CommandResult;
using rs2test::ExpectOutcome;
using rs2test::Outcome;
using rs2test::Quoted;
using rs2test::RunRs2;

const std::string kCatalogue = RS2_SOURCE_DIR "/tests/data/broken";

std::string Calibrated(const std::string &folder) {
    return Quoted(folder + "/product.xml?c=sigma");
}

// What a case's folder holds, file by file: a command must change none of
// it, whatever it reads.
std::map<std::string, std::string> FolderContents(const std::string &folder) {
    std::map<std::string, std::string> contents;
    for (const auto &entry : fs::recursive_directory_iterator(folder))
        if (entry.is_regular_file())
            contents[entry.path().string()] =
                rs2test::FileText(entry.path().string());
    return contents;
}

// The arguments of a command run over the product in folder, writing
// into out when it writes.
std::string Arguments(const std::string &command, const std::string &folder,
                      const std::string &out) {
    const std::string name = Calibrated(folder);
    if (command == "export")
        return "export " + name + " " + Quoted(out + "/out.tif");
    if (command == "quicklook")
        return "quicklook " + name + " " + Quoted(out + "/out.png");
    if (command == "read")
        return "read " + name + " --window 0 0 2 2 --json";
    return command + " " + name;
}

TEST(BrokenProducts, every_command_ends_on_every_case_as_its_manifest_says) {
    const std::vector<BrokenCase> cases =
        rs2test::ReadCatalogue(kCatalogue + "/cases.txt");
    std::set<std::string> listed;
    rs2test::TempDir root;
    for (const BrokenCase &c : cases) {
        SCOPED_TRACE(c.name + ": " + c.breaks);
        listed.insert(c.name);
        const std::string folder =
            rs2test::PrepareCase(kCatalogue, c.name, root.Path());
        const auto before = FolderContents(folder);
        for (const std::string &command : rs2test::CatalogueCommands()) {
            SCOPED_TRACE(command);
            const Outcome &expected = c.outcomes.at(command);
            rs2test::TempDir out;
            ExpectOutcome(RunRs2(Arguments(command, folder, out.Path())),
                          expected);
            // A failed command leaves nothing, a part file least of all.
            const std::vector<std::string> left =
                rs2test::FolderEntries(out.Path());
            EXPECT_TRUE(expected.exitCode == 0 ? left.size() <= 1
                                               : left.empty())
                << left.size() << " files left";
        }
        EXPECT_TRUE(FolderContents(folder) == before) << "inputs changed";
    }
    for (const auto &entry : fs::directory_iterator(kCatalogue)) {
        if (entry.is_directory()) {
            EXPECT_EQ(listed.count(entry.path().filename().string()), 1u)
                << entry.path() << " has no line in cases.txt";
        }
    }
}

// The real samples of line 0 of a calibrated product, as `rs2 read --json`
// gives them (null for an infinity or not a number).
nlohmann::json FirstLine(const std::string &folder) {
    const CommandResult run =
        RunRs2("read " + Calibrated(folder) + " --window 0 0 " +
               std::to_string(rs2test::kCaseWidth) + " 1 --real --json");
    EXPECT_EQ(run.exitCode, 0) << run.errors;
    return nlohmann::json::parse(run.output)["data"];
}

// Detected sample s of column x, line 0, calibrated with gain g: s * s / g.
float CalibratedSample(int x, float gain) {
    const float s = rs2gen::DetectedSample(rs2test::CaseOptions(), 0, x, 0);
    return s * s / gain;
}

TEST(BrokenProducts,
     zero_gains_give_infinite_pixels_and_negative_gains_negative_ones) {
    rs2test::TempDir root;
    const nlohmann::json alternating = FirstLine(rs2test::PrepareCase(
        kCatalogue, "lut-zero-negative-gains", root.Path()));
    const nlohmann::json words = FirstLine(
        rs2test::PrepareCase(kCatalogue, "lut-non-numeric-gains", root.Path()));
    ASSERT_EQ(alternating.size(), static_cast<size_t>(rs2test::kCaseWidth));
    ASSERT_EQ(words.size(), static_cast<size_t>(rs2test::kCaseWidth));
    for (int x = 0; x < rs2test::kCaseWidth; ++x) {
        SCOPED_TRACE(x);
        // Gains 0, -4, 0, -4, ...
        if (x % 2 == 0)
            EXPECT_TRUE(alternating[x].is_null());
        else
            EXPECT_FLOAT_EQ(alternating[x].get<float>(),
                            CalibratedSample(x, -4.0f));
        // Three words, then 13 gains of 2: the numbers fill the first
        // columns and the last three gains stay 0.
        if (x < rs2test::kCaseWidth - 3)
            EXPECT_FLOAT_EQ(words[x].get<float>(), CalibratedSample(x, 2.0f));
        else
            EXPECT_TRUE(words[x].is_null());
    }
}

TEST(BrokenProducts, a_table_of_three_million_gains_is_read_and_applied) {
    rs2test::TempDir root;
    const std::string folder =
        rs2test::PrepareCase(kCatalogue, "lut-wrong-count", root.Path());
    std::ofstream table(folder + "/lutSigma.xml", std::ios::trunc);
    table << "<lut><offset>0</offset><gains>";
    for (int i = 0; i < 3000000; ++i)
        table << (i == 0 ? "" : " ") << (i % 2 == 0 ? "2" : "8");
    table << "</gains></lut>\n";
    table.close();
    const nlohmann::json line = FirstLine(folder);
    ASSERT_EQ(line.size(), static_cast<size_t>(rs2test::kCaseWidth));
    for (int x = 0; x < rs2test::kCaseWidth; ++x)
        EXPECT_FLOAT_EQ(line[x].get<float>(),
                        CalibratedSample(x, x % 2 == 0 ? 2.0f : 8.0f))
            << x;
}

TEST(BrokenProducts, a_grid_of_100000_tie_points_is_read_and_thinned) {
    rs2test::TempDir root;
    const std::string folder =
        rs2test::PrepareCase(kCatalogue, "no-tie-points", root.Path());
    std::string grid = "<geolocationGrid>";
    // The 16 x 12 pixel positions, each given many times over.
    for (int i = 0; i < 100000; ++i)
        grid += "<imageTiePoint><imageCoordinate><line>" +
                std::to_string(i / 400 % 12) + "</line><pixel>" +
                std::to_string(i % 16) +
                "</pixel></imageCoordinate><geodeticCoordinate><latitude>" +
                std::to_string(49.2 - 1e-3 * (i / 400 % 12)) +
                "</latitude><longitude>" +
                std::to_string(-123.5 + 1e-3 * (i % 16)) +
                "</longitude><height>0</height></geodeticCoordinate>"
                "</imageTiePoint>";
    grid += "</geolocationGrid>";
    std::string withGrid = rs2test::FileText(folder + "/product.xml");
    withGrid.insert(withGrid.find("<lookupTable"), grid);
    rs2test::WriteFile(folder + "/product.xml", withGrid);

    const CommandResult run = RunRs2("info --json " + Quoted(folder));
    ASSERT_EQ(run.exitCode, 0) << run.errors;
    const nlohmann::json info = nlohmann::json::parse(run.output);
    EXPECT_EQ(info["gcps"]["points"].size(),
              static_cast<size_t>(kMaxGcpSegmentPoints));
    EXPECT_EQ(info["projection"]["geosys"], "UTM 10 U D000");
}

// The lines `rs2 text` prints for the product in folder.
std::vector<std::string> TextLines(const std::string &folder) {
    const CommandResult run = RunRs2("text " + Quoted(folder));
    EXPECT_EQ(run.exitCode, 0) << run.errors;
    std::vector<std::string> lines;
    std::istringstream output(run.output);
    for (std::string line; std::getline(output, line);)
        lines.push_back(line);
    return lines;
}

TEST(BrokenProducts, descriptions_of_one_long_line_or_wide_text_are_text) {
    rs2test::TempDir root;
    const std::string oneLine = root.Path() + "/long";
    rs2gen::GenerateProduct(oneLine, rs2test::CaseOptions());
    std::string text = rs2test::FileText(oneLine + "/product.xml");
    std::replace(text.begin(), text.end(), '\n', ' ');
    text.insert(text.find("<product"), std::string(70000, ' '));
    rs2test::WriteFile(oneLine + "/product.xml", text);
    EXPECT_EQ(TextLines(oneLine), std::vector<std::string>{text});
    rs2test::TempDir out;
    const CommandResult denoised =
        RunRs2("export " + Quoted(oneLine) + " " + Quoted(out.File("d.tif")) +
               " --calibration sigma --denoise");
    EXPECT_EQ(denoised.exitCode, 0) << denoised.errors;

    for (const char *wide : {"utf16-description", "utf32-description"}) {
        const std::vector<std::string> lines =
            TextLines(rs2test::PrepareCase(kCatalogue, wide, root.Path()));
        ASSERT_FALSE(lines.empty()) << wide;
        EXPECT_EQ(lines.front().rfind("<?xml version=\"1.0\"", 0), 0u) << wide;
        EXPECT_NE(std::find_if(lines.begin(), lines.end(),
                               [](const std::string &line) {
                                   return line.find("<productType>SGF<") !=
                                          std::string::npos;
                               }),
                  lines.end())
            << wide;
    }
}

TEST(BrokenProducts, a_folder_named_by_bytes_that_are_not_utf8_opens) {
    rs2test::TempDir root;
    const std::string folder = rs2test::PrepareCase(
        kCatalogue, "names-with-spaces", root.Path() + "/caf\xE9 \xFF");
    const CommandResult run = RunRs2("info " + Calibrated(folder));
    EXPECT_EQ(run.exitCode, 0) << run.errors;
    EXPECT_NE(run.output.find("Sigma0"), std::string::npos) << run.output;
    const CommandResult json = RunRs2("info --json " + Calibrated(folder));
    ASSERT_EQ(json.exitCode, 0) << json.errors;
    // The canonical name is a URI, which writes those bytes escaped.
    const std::string name = nlohmann::json::parse(json.output)["name"];
    EXPECT_NE(name.find("caf%E9%20%FF/names-with-spaces/product.xml?c=sigma"),
              std::string::npos)
        << name;
}

// Inputs far larger than the catalogue's own: each must still load, and
// give what its small form gives.
TEST(BrokenProducts, many_colon_keys_and_many_lookup_tables_load) {
    rs2test::TempDir root;
    const std::string colons = rs2test::PrepareCase(
        kCatalogue, "side-file-keys-with-colons", root.Path());
    std::string side;
    for (int i = 0; i < 160000; ++i)
        side += "key: " + std::to_string(i) + " = value: " + std::to_string(i) +
                ";\n";
    rs2test::WriteFile(colons + "/ProductDescription.self", side);
    const CommandResult withColons = RunRs2("info --json " + Quoted(colons));
    ASSERT_EQ(withColons.exitCode, 0) << withColons.errors;
    const nlohmann::json metadata =
        nlohmann::json::parse(withColons.output)["metadata"];
    EXPECT_NE(std::find(metadata.begin(), metadata.end(),
                        nlohmann::json({"key", "159999: value: 159999"})),
              metadata.end());

    const std::string tables =
        rs2test::PrepareCase(kCatalogue, "many-lookup-tables", root.Path());
    std::string names;
    for (int i = 0; i < 100000; ++i)
        names += "<lookupTable k=\"Noise " + std::to_string(i) +
                 "\">n.xml</lookupTable>";
    std::string description = rs2test::FileText(tables + "/product.xml");
    description.insert(description.find("<lookupTable"), names);
    rs2test::WriteFile(tables + "/product.xml", description);
    const CommandResult withTables =
        RunRs2("info --json " + Calibrated(tables));
    ASSERT_EQ(withTables.exitCode, 0) << withTables.errors;
    const nlohmann::json info = nlohmann::json::parse(withTables.output);
    EXPECT_EQ(info["calibration_types"].size(), 100000u + 300u + 4u);
    EXPECT_EQ(info["calibration_types"][0], ":Calibration Type:Sigma Nought");
}

} // namespace
