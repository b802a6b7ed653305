#include "host/GeoTiffWriter.hpp"
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

#include <cstdlib>
#include <fstream>
#include <sstream>
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
        const rs2gen::GeneratedProduct generated =
            rs2gen::GenerateProduct(folder.Path(), options);
        xml = generated.productXml;
        image = generated.imageFiles[0];
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
    std::string image;
    std::vector<StatedPoint> grid;
};

// Replaces the product's image by one whose samples tell where they stand:
// in-phase column + 1, quadrature line + 1 (0 is left for no data).
void WritePositionCodedImage(const std::string &path, int width, int height) {
    host::GeoTiffWriter writer(path, width, height, 1,
                               host::SampleType::ComplexInt16);
    std::vector<int16_t> row(2 * static_cast<size_t>(width));
    for (int line = 0; line < height; ++line) {
        for (int column = 0; column < width; ++column) {
            row[2 * column] = static_cast<int16_t>(column + 1);
            row[2 * column + 1] = static_cast<int16_t>(line + 1);
        }
        writer.WriteRows(line, 1, row.data());
    }
    writer.Close();
}

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

// GDAL reads what rs2 writes: the control points and no transform, and a
// thin-plate-spline warp onto a map puts every tie point within one output
// pixel of the pixel the product places there.
TEST(ExportControlPoints, gdal_warps_a_slant_range_export_by_its_points) {
    const SlantRangeProduct product;
    WritePositionCodedImage(product.image, 60, 40);
    const std::string out = product.out.File("slant.tif");
    ASSERT_EQ(RunShell(Rs2() + " export " + Quoted(product.xml) + " " +
                       Quoted(out) + " --window 10 5 40 30")
                  .exitCode,
              0);
    const CommandResult info = RunShell("gdalinfo " + Quoted(out));
    ASSERT_EQ(info.exitCode, 0) << info.errors;
    EXPECT_EQ(info.output.find("GeoTransform"), std::string::npos);
    size_t gcps = 0;
    for (size_t at = info.output.find("GCP["); at != std::string::npos;
         at = info.output.find("GCP[", at + 1))
        ++gcps;
    EXPECT_EQ(gcps, product.grid.size());

    // Output pixels of about 4 m, a third of the image's.
    const std::string warped = product.out.File("warped.tif");
    const CommandResult warp =
        RunShell("gdalwarp -q -tps -r near -t_srs EPSG:4326 -tr 5e-5 3e-5 " +
                 Quoted(out) + " " + Quoted(warped));
    ASSERT_EQ(warp.exitCode, 0) << warp.errors;
    std::string places;
    std::vector<const StatedPoint *> inside;
    for (const StatedPoint &p : product.grid) {
        if (p.pixel < 10 || p.pixel >= 50 || p.line < 5 || p.line >= 35)
            continue;
        inside.push_back(&p);
        places += std::to_string(p.longitude) + " " +
                  std::to_string(p.latitude) + "\n";
    }
    ASSERT_GE(inside.size(), 10u);
    std::ofstream(product.out.File("places.txt")) << places;
    const CommandResult values =
        RunShell("gdallocationinfo -valonly -geoloc " + Quoted(warped) + " < " +
                 Quoted(product.out.File("places.txt")));
    ASSERT_EQ(values.exitCode, 0) << values.errors;
    std::istringstream read(values.output);
    for (const StatedPoint *p : inside) {
        // One complex value a place: "column+linei".
        int column = 0, line = 0;
        char plus = 0, imaginary = 0;
        ASSERT_TRUE(read >> column >> plus >> line >> imaginary)
            << values.output;
        ASSERT_EQ(std::string() + plus + imaginary, "+i") << values.output;
        EXPECT_LE(std::abs(column - 1 - p->pixel), 1)
            << "tie point " << p->pixel << "," << p->line;
        EXPECT_LE(std::abs(line - 1 - p->line), 1)
            << "tie point " << p->pixel << "," << p->line;
    }
}
