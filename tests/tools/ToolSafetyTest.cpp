#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <csignal>
#include <filesystem>
#include <fstream>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace {

namespace fs = std::filesystem;

using rs2test::CommandResult;
using rs2test::Quoted;

CommandResult Rs2(const std::string &arguments) {
    return rs2test::RunShell(Quoted(RS2_TOOL) + " " + arguments);
}

// A failure as the tool reports it: the one line "rs2: " and the text.
void ExpectOneLine(const CommandResult &result, const std::string &text,
                   const std::string &context) {
    EXPECT_EQ(result.errors.rfind("rs2: ", 0), 0u) << context;
    EXPECT_EQ(result.errors.find('\n'), result.errors.size() - 1) << context;
    EXPECT_NE(result.errors.find(text), std::string::npos)
        << context << ": " << result.errors;
}

rs2gen::ProductOptions SmallProduct(bool lookupTables = true) {
    rs2gen::ProductOptions options;
    options.polarizations = {"HH", "HV"};
    options.width = 16;
    options.height = 12;
    options.sideFile = true;
    options.lookupTables = lookupTables;
    return options;
}

void WriteText(const std::string &path, const std::string &text) {
    std::ofstream(path) << text;
}

} // namespace

TEST(OutputTargets, only_absent_or_writable_regular_files_are_replaced) {
    rs2test::TempDir product, out;
    const rs2gen::GeneratedProduct generated =
        rs2gen::GenerateProduct(product.Path(), SmallProduct());
    ASSERT_EQ(mkfifo(out.File("fifo").c_str(), 0644), 0);
    WriteText(out.File("kept.tif"), "keep");
    fs::create_symlink(out.File("kept.tif"), out.File("link.tif"));
    WriteText(out.File("read-only.tif"), "keep");
    fs::permissions(out.File("read-only.tif"), fs::perms::owner_read);
    fs::create_directory(out.File("folder"));
    fs::create_hard_link(product.File("lutSigma.xml"), out.File("table.xml"));
    const std::pair<std::string, std::string> refused[] = {
        {out.File("fifo"), "it is a FIFO"},
        {out.File("link.tif"), "it is a symbolic link"},
        {out.File("read-only.tif"), "it is read-only"},
        {out.File("folder"), "it is a directory"},
        {out.File("table.xml"), "it is the dataset's own file"},
        {generated.productXml, "it is the dataset's own file"},
        {generated.imageFiles[0], "it is the dataset's own file"},
        {product.File("ProductDescription.self"),
         "it is the dataset's own file"},
    };
    const std::string before = rs2test::FileText(generated.imageFiles[0]);
    for (const char *command : {"export", "quicklook"})
        for (const auto &[target, why] : refused) {
            const std::string context = std::string(command) + " " + target;
            const CommandResult result =
                Rs2(std::string(command) + " " + Quoted(product.Path()) + " " +
                    Quoted(target));
            EXPECT_EQ(result.exitCode, 1) << context;
            ExpectOneLine(result, "cannot write " + target + ": " + why,
                          context);
        }
    EXPECT_TRUE(fs::is_fifo(out.File("fifo")));
    EXPECT_TRUE(fs::is_symlink(out.File("link.tif")));
    EXPECT_EQ(rs2test::FileText(out.File("kept.tif")), "keep");
    EXPECT_EQ(rs2test::FileText(out.File("read-only.tif")), "keep");
    EXPECT_EQ(rs2test::FileText(generated.imageFiles[0]), before);
    EXPECT_EQ(rs2test::FolderEntries(out.Path()).size(), 6u);

    // A writable regular file is replaced by the output.
    EXPECT_EQ(Rs2("export " + Quoted(product.Path()) + " " +
                  Quoted(out.File("kept.tif")))
                  .exitCode,
              0);
    EXPECT_NE(rs2test::FileText(out.File("kept.tif")), "keep");
}

TEST(OutputTargets, a_file_size_limit_ends_the_export_without_a_part_file) {
    rs2test::TempDir product, out;
    rs2gen::ProductOptions options = SmallProduct();
    options.width = 300;
    options.height = 200;
    rs2gen::GenerateProduct(product.Path(), options);
    const CommandResult result = rs2test::RunShell(
        "ulimit -f 64; " + Quoted(RS2_TOOL) + " export " +
        Quoted(product.Path()) + " " + Quoted(out.File("big.tif")));
    EXPECT_EQ(result.exitCode, 128 + SIGXFSZ) << result.errors;
    EXPECT_TRUE(rs2test::FolderEntries(out.Path()).empty());
}

TEST(Calibration, a_calibration_asked_for_is_applied_or_refused) {
    rs2test::TempDir product, out;
    rs2gen::GenerateProduct(product.Path(), SmallProduct(false));
    const std::string name = Quoted(product.Path() + "?c=sigma");
    const std::string target = " " + Quoted(out.File("out"));
    const std::string noTable = "Sigma Nought calibration not applied: The "
                                "specified LUT file " +
                                product.File("lutSigma.xml");
    const struct {
        std::string arguments;
        int exitCode;
        std::string errors; // the one line on stderr
        std::string output; // part of stdout
    } cases[] = {
        {"export " + name + target + " --db", 1, noTable, ""},
        {"quicklook " + name + target, 1, noTable, ""},
        {"export " + Quoted(product.Path()) + target + " --calibration beta", 1,
         "Beta Nought calibration not applied", ""},
        {"export " +
             Quoted(product.File("product.xml") + ":Calibration Type:Gamma") +
             target,
         1, "Gamma calibration not applied", ""},
        {"read " + name + " --window 0 0 1 1", 0, "rs2: warning: " + noTable,
         ""},
        {"info " + name, 0, "rs2: warning: " + noTable, "None (" + noTable},
        {"export " + Quoted(product.Path() + "?c=none") + target, 0, "",
         "int32"},
    };
    for (const auto &c : cases) {
        const CommandResult result = Rs2(c.arguments);
        EXPECT_EQ(result.exitCode, c.exitCode) << c.arguments;
        if (c.errors.empty()) {
            EXPECT_EQ(result.errors, "") << c.arguments;
        } else {
            ExpectOneLine(result, c.errors, c.arguments);
        }
        EXPECT_NE(result.output.find(c.output), std::string::npos)
            << c.arguments << ": " << result.output;
        if (c.exitCode != 0) {
            EXPECT_TRUE(rs2test::FolderEntries(out.Path()).empty())
                << c.arguments;
        }
    }
}

TEST(Rs2Tool, requests_are_checked_against_the_dataset_before_reading) {
    rs2test::TempDir product, missing, empty, out;
    rs2gen::ProductOptions options = SmallProduct();
    rs2gen::GenerateProduct(product.Path(), options);
    options.sideFile = false; // the channels come from product.xml
    rs2gen::GenerateProduct(missing.Path(), options);
    fs::remove(missing.File("imagery_HV.tif"));
    options.images = false;
    rs2gen::GenerateProduct(empty.Path(), options);
    const std::string p = Quoted(product.Path()) + " ";
    const std::string target = Quoted(out.File("out")) + " ";
    const struct {
        std::string arguments;
        int exitCode;
        std::string text;
    } cases[] = {
        {"read " + p + "--window 10 0 10 1", 2, "does not lie within"},
        {"read " + p + "--window 0 0 100000 100000", 2, "does not lie within"},
        {"export " + p + target + "--window 5 5 100000 100000", 2,
         "does not lie within"},
        {"export " + p + target + "--looks 1000000x1", 2,
         "1000000x1 blocks do not fit the 12 lines by 16 columns"},
        {"read " + p + "--window 0 0 2 2 --size 0 2", 2,
         "--size: \"0\" is no size"},
        {"read " + Quoted(product.Path() + "?c=sigma") +
             " --window 0 0 1 1 --int",
         2, "--int"},
        {"read " + Quoted(missing.Path()) + " --window 0 0 1 1 --channels 2", 1,
         "cannot open " + missing.File("imagery_HV.tif")},
        {"quicklook " + Quoted(empty.Path()) + " " + target, 1,
         "no pixels to preview"},
    };
    for (const auto &c : cases) {
        const CommandResult result = Rs2(c.arguments);
        EXPECT_EQ(result.exitCode, c.exitCode) << c.arguments;
        ExpectOneLine(result, c.text, c.arguments);
        EXPECT_TRUE(rs2test::FolderEntries(out.Path()).empty()) << c.arguments;
    }
}

TEST(Rs2Tool, a_name_whose_file_does_not_exist_says_so) {
    rs2test::TempDir product;
    rs2gen::GenerateProduct(product.Path(), SmallProduct());
    const std::string absent = product.File("absent.xml");
    const std::pair<std::string, std::string> cases[] = {
        {absent, absent},
        {absent + "?c=sigma", absent},
        {absent + ":Calibration Type:Sigma Nought", absent},
        {"file://" + absent + "?c=beta", absent},
        {product.File("no/product.xml"), product.File("no/product.xml")},
    };
    for (const auto &[name, path] : cases) {
        const CommandResult result = Rs2("info " + Quoted(name));
        EXPECT_EQ(result.exitCode, 1) << name;
        ExpectOneLine(result, "cannot open " + path + ": no such file", name);
    }
    // Names of an existing file with a choice are no missing file.
    for (const char *suffix : {"?c=sigma", ":Calibration Type:Sigma Nought"})
        EXPECT_EQ(Rs2("info " + Quoted(product.File("product.xml") + suffix))
                      .exitCode,
                  0)
            << suffix;
}

TEST(Rs2Tool, info_reads_as_plain_text_and_json_takes_any_byte) {
    rs2test::TempDir product;
    rs2gen::GenerateProduct(product.Path(), SmallProduct());
    std::ofstream(product.File("ProductDescription.self"), std::ios::app)
        << "site = Montr\xE9"
           "al;\n";
    const CommandResult text = Rs2("info " + Quoted(product.Path() + "//"));
    ASSERT_EQ(text.exitCode, 0) << text.errors;
    for (const char *shown :
         {"incidence near (deg)   36.40\n", "UTM 10 U D000 (EPSG:32610)",
          "HH detected data (int32)", "/imagery_HH.tif"})
        EXPECT_NE(text.output.find(shown), std::string::npos) << shown;
    EXPECT_EQ(text.output.find("e+01"), std::string::npos);
    EXPECT_EQ(text.output.find("//imagery"), std::string::npos);

    const CommandResult json = Rs2("info --json " + Quoted(product.Path()));
    ASSERT_EQ(json.exitCode, 0) << json.errors;
    EXPECT_NE(nlohmann::json::parse(json.output).dump().find("Montr\xC3\xA9"),
              std::string::npos);
}

TEST(SampleCommand, a_folder_that_holds_files_is_replaced_only_by_force) {
    rs2test::TempDir folder;
    fs::create_directory(folder.File("empty"));
    fs::create_directory(folder.File("full"));
    WriteText(folder.File("full/product.xml"), "mine");
    const std::string full = Quoted(folder.File("full"));
    EXPECT_EQ(Rs2("sample " + Quoted(folder.File("empty"))).exitCode, 0);
    const CommandResult refused = Rs2("sample " + full);
    EXPECT_EQ(refused.exitCode, 1);
    ExpectOneLine(refused, "is not empty; give --force", "sample full");
    EXPECT_EQ(rs2test::FileText(folder.File("full/product.xml")), "mine");
    EXPECT_EQ(Rs2("sample --force " + full).exitCode, 0);
    EXPECT_NE(rs2test::FileText(folder.File("full/product.xml")), "mine");
}
