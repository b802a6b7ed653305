#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TiffContents.hpp"
#include "tests/support/TiffInspection.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <geovalues.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <tiffio.h>
#include <xtiffio.h>

#include <fstream>
#include <string>
#include <vector>

namespace {

using rs2test::CommandResult;
using rs2test::FileText;
using rs2test::Quoted;
using rs2test::RunShell;

std::string Rs2() { return Quoted(RS2_TOOL); }

// A geolocation grid point as the product states it: integer pixel centres.
struct StatedPoint {
    int pixel, line;
    double longitude, latitude, height;
};

// Ground positions that run away from an affine map across the range, as a
// slant-range image's do: the ground step of a column grows toward far
// range, here by a quarter over 60 columns (the chord misses the middle by
// about 12 pixels).
std::vector<StatedPoint> SlantRangeGrid(int width, int height) {
    std::vector<StatedPoint> grid;
    for (int line = 0; line < height; line += (height - 1) / 3)
        for (int pixel = 0; pixel < width; pixel += (width - 1) / 9)
            grid.push_back(
                {pixel, line,
                 -123.5 + 1.4e-4 * pixel + 2e-6 * pixel * pixel - 2e-5 * line,
                 49.2 - 9e-5 * line + 1e-5 * pixel,
                 100.0 + pixel + 0.5 * line});
    return grid;
}

// A generated SLC product whose geolocation grid is the slant-range grid.
struct SlantRangeProduct {
    SlantRangeProduct() {
        rs2gen::ProductOptions options;
        options.productType = "SLC";
        options.polarizations = {"HH"};
        options.width = 60;
        options.height = 40;
        xml = rs2gen::GenerateProduct(folder.Path(), options).productXml;
        grid = SlantRangeGrid(options.width, options.height);
        std::string text = FileText(xml);
        const size_t begin = text.find("<geolocationGrid>");
        const size_t end = text.find("</geolocationGrid>");
        std::string points = "<geolocationGrid>";
        for (const StatedPoint &p : grid)
            points += "<imageTiePoint><imageCoordinate><line>" +
                      std::to_string(p.line) + "</line><pixel>" +
                      std::to_string(p.pixel) +
                      "</pixel></imageCoordinate><geodeticCoordinate>"
                      "<latitude>" +
                      std::to_string(p.latitude) + "</latitude><longitude>" +
                      std::to_string(p.longitude) + "</longitude><height>" +
                      std::to_string(p.height) +
                      "</height></geodeticCoordinate></imageTiePoint>";
        text.replace(begin, end - begin, points);
        std::ofstream(xml, std::ios::binary | std::ios::trunc) << text;
    }
    rs2test::TempDir folder;
    rs2test::TempDir out;
    std::string xml;
    std::vector<StatedPoint> grid;
};

nlohmann::json InfoJson(const std::string &name) {
    const CommandResult result =
        RunShell(Rs2() + " info --json " + Quoted(name));
    EXPECT_EQ(result.exitCode, 0) << result.errors;
    return result.exitCode == 0 ? nlohmann::json::parse(result.output)
                                : nlohmann::json();
}

// The values of the file's RPC tag; none without one. libtiff reads the tag
// it does not know with a 32-bit count.
std::vector<double> RpcTag(const std::string &path) {
    rs2test::TiffKeeper tiff(XTIFFOpen(path.c_str(), "r"));
    uint32_t count = 0;
    double *values = nullptr;
    if (!tiff || TIFFGetField(tiff.get(), 50844, &count, &values) != 1)
        return {};
    return std::vector<double>(values, values + count);
}

} // namespace

TEST(ExportControlPoints, a_slant_range_export_carries_every_grid_point) {
    const SlantRangeProduct product;
    struct Case {
        std::string arguments;
        double x, y, columnStep, lineStep;
    };
    const Case cases[] = {
        {"", 0, 0, 1, 1},
        {" --window 10 5 30 20 --size 15 40", 10, 5, 2, 0.5},
        {" --looks 4x3", 0, 0, 3, 4},
    };
    for (const Case &c : cases) {
        const std::string out = product.out.File("gcps.tif");
        const CommandResult result =
            RunShell(Rs2() + " export " + Quoted(product.xml) + " " +
                     Quoted(out) + c.arguments);
        ASSERT_EQ(result.exitCode, 0) << result.errors;
        const rs2test::TiffContents t = rs2test::ReadTiff(out);
        EXPECT_TRUE(t.matrix.empty()) << c.arguments;
        rs2test::TiffKeeper tiff(XTIFFOpen(out.c_str(), "r"));
        EXPECT_TRUE(
            rs2test::DoubleArray(tiff.get(), TIFFTAG_GEOPIXELSCALE).empty())
            << c.arguments;
        EXPECT_EQ(t.modelType, ModelTypeGeographic) << c.arguments;
        EXPECT_EQ(t.geographic, GCS_WGS_84) << c.arguments;
        ASSERT_EQ(t.ties.size(), 6 * product.grid.size()) << c.arguments;
        for (size_t i = 0; i < product.grid.size(); ++i) {
            const StatedPoint &p = product.grid[i];
            const double *tie = &t.ties[6 * i];
            EXPECT_NEAR(tie[0], (p.pixel + 0.5 - c.x) / c.columnStep, 1e-9)
                << c.arguments;
            EXPECT_NEAR(tie[1], (p.line + 0.5 - c.y) / c.lineStep, 1e-9)
                << c.arguments;
            EXPECT_NEAR(tie[3], p.longitude, 1e-6) << c.arguments;
            EXPECT_NEAR(tie[4], p.latitude, 1e-6) << c.arguments;
            EXPECT_NEAR(tie[5], p.height, 1e-6) << c.arguments;
        }
        // The host reads the points back as the export's georeferencing.
        const nlohmann::json info = InfoJson(out);
        EXPECT_EQ(info["gcps"]["points"].size(), product.grid.size());
    }
}

TEST(ExportControlPoints, info_reports_the_affine_misfit_in_metres) {
    const SlantRangeProduct slant;
    const nlohmann::json bent = InfoJson(slant.xml)["affine_misfit"];
    ASSERT_TRUE(bent.is_object());
    // About 12 pixels of 10 m in the middle of the swath, less in RMS.
    EXPECT_GT(bent["max_m"].get<double>(), 50.0);
    EXPECT_LT(bent["rms_m"].get<double>(), bent["max_m"].get<double>());
    EXPECT_EQ(bent["tie_points"].get<size_t>(), slant.grid.size());

    rs2test::TempDir folder;
    rs2gen::ProductOptions options;
    options.productType = "SGF";
    options.width = 60;
    options.height = 40;
    const nlohmann::json mapped =
        InfoJson(rs2gen::GenerateProduct(folder.Path(), options).productXml);
    EXPECT_LT(mapped["affine_misfit"]["max_m"].get<double>(), 1.0);

    const CommandResult text = RunShell(Rs2() + " info " + Quoted(slant.xml));
    EXPECT_NE(text.output.find("affine misfit          max "),
              std::string::npos)
        << text.output;
}

TEST(ExportControlPoints,
     the_rpc_model_is_written_only_where_it_fits_the_grid) {
    // The generated model is the exact inverse of the generated grid; the
    // slant-range grid leaves it tens of pixels off.
    const SlantRangeProduct slant;
    const std::string bent = slant.out.File("bent.tif");
    ASSERT_EQ(
        RunShell(Rs2() + " export " + Quoted(slant.xml) + " " + Quoted(bent))
            .exitCode,
        0);
    EXPECT_TRUE(RpcTag(bent).empty());

    rs2test::TempDir folder;
    rs2gen::ProductOptions options;
    options.productType = "SLC";
    options.polarizations = {"HH"};
    options.width = 60;
    options.height = 40;
    const std::string xml =
        rs2gen::GenerateProduct(folder.Path(), options).productXml;
    const std::string out = folder.File("rpc.tif");
    ASSERT_EQ(RunShell(Rs2() + " export " + Quoted(xml) + " " + Quoted(out) +
                       " --window 10 5 30 20 --size 15 40")
                  .exitCode,
              0);
    const std::vector<double> rpc = RpcTag(out);
    ASSERT_EQ(rpc.size(), 92u);
    // The model's centre, pixel 29.5 and line 19.5 counted from the first
    // pixel's centre, lies at (30 - 10) / 2 - 0.5 and (20 - 5) / 0.5 - 0.5
    // in the output grid; the scales of 30 columns and 20 lines shrink by
    // the steps.
    EXPECT_DOUBLE_EQ(rpc[2], 29.5); // line offset
    EXPECT_DOUBLE_EQ(rpc[3], 9.5);  // sample offset
    EXPECT_DOUBLE_EQ(rpc[7], 40.0); // line scale
    EXPECT_DOUBLE_EQ(rpc[8], 15.0); // sample scale
}
