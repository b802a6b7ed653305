#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <string>

namespace {

using rs2test::Quoted;

rs2test::CommandResult RunTool(const std::string &arguments) {
    return rs2test::RunShell(Quoted(RS2_TOOL) + " " + arguments);
}

class ToolOnProduct : public ::testing::Test {
  protected:
    void SetUp() override {
        options.polarizations = {"HH", "HV"};
        options.width = 24;
        options.height = 16;
        options.sideFile = true;
        product = rs2gen::GenerateProduct(folder.Path(), options);
    }
    rs2test::TempDir folder;
    rs2gen::ProductOptions options;
    rs2gen::GeneratedProduct product;
};

} // namespace

TEST_F(ToolOnProduct, info_json_keeps_its_contract) {
    rs2test::CommandResult result =
        RunTool("info --json " + Quoted(product.productXml + "?c=sigma"));
    ASSERT_EQ(result.exitCode, 0);
    nlohmann::json info = nlohmann::json::parse(result.output);
    for (const char *member :
         {"name", "width", "height", "object_name", "channels", "metadata",
          "projection", "gcps", "segments", "calibration_types", "files",
          "incidence", "orbit", "rpc", "warnings"})
        EXPECT_TRUE(info.contains(member)) << member;
    EXPECT_EQ(info["width"], 24);
    EXPECT_EQ(info["height"], 16);
    EXPECT_EQ(info["object_name"], "ProductType: SGF");
    ASSERT_EQ(info["channels"].size(), 2u);
    EXPECT_EQ(info["channels"][0]["type"], 4); // calibrated detected
    EXPECT_EQ(info["channels"][1]["description"], "HV detected data");
    EXPECT_EQ(info["segments"].size(), 5u);
    EXPECT_EQ(info["calibration_types"].back(), ":Calibration Type:None");
    EXPECT_EQ(info["incidence"]["values"].size(), 24u);
    EXPECT_EQ(info["projection"]["code"], 2); // UTM
    EXPECT_FALSE(info["orbit"].is_null());
    EXPECT_FALSE(info["rpc"].is_null());
    EXPECT_NE(info["name"].get<std::string>().find("c=sigma"),
              std::string::npos);
}

TEST_F(ToolOnProduct, read_json_gives_the_stored_samples) {
    rs2test::CommandResult result =
        RunTool("read --json " + Quoted(product.productXml) +
                " --window 3 2 4 3 --size 2 3 --channels 2");
    ASSERT_EQ(result.exitCode, 0);
    nlohmann::json read = nlohmann::json::parse(result.output);
    EXPECT_EQ(read["type"], 3);
    ASSERT_EQ(read["data"].size(), 6u);
    // Output column k reads source column 3 + floor(k * 4 / 2).
    for (int y = 0; y < 3; ++y)
        for (int x = 0; x < 2; ++x)
            EXPECT_EQ(read["data"][y * 2 + x],
                      rs2gen::DetectedSample(options, 1, 3 + 2 * x, 2 + y))
                << x << "," << y;
}

TEST_F(ToolOnProduct, exit_codes_tell_errors_from_bad_usage) {
    const std::pair<std::string, int> cases[] = {
        {"--version", 0},
        {"info " + Quoted(product.productXml), 0},
        {"info", 2},                                       // NAME missing
        {"read " + Quoted(product.productXml), 2},         // --window missing
        {"frobnicate", 2},                                 // no such command
        {"info " + Quoted(folder.File("missing.xml")), 1}, // nothing there
        {"info " + Quoted(product.productXml + "?c=sigma0"), 1}, // bad choice
        {"read " + Quoted(product.productXml) + " --window 20 0 10 1", 2},
        {"read " + Quoted(product.productXml) +
             " --window 0 0 2 2 --channels 3",
         2},
    };
    for (const auto &[arguments, code] : cases)
        EXPECT_EQ(RunTool(arguments).exitCode, code) << arguments;
}

TEST_F(ToolOnProduct, text_prints_the_product_description) {
    rs2test::CommandResult result =
        RunTool("text " + Quoted(product.productXml));
    ASSERT_EQ(result.exitCode, 0);
    EXPECT_EQ(result.output.rfind("<?xml", 0), 0u);
    EXPECT_NE(result.output.find("<productType>SGF</productType>"),
              std::string::npos);
}
