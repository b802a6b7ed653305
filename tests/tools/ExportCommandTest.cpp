#include "host/Raster.hpp"
#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TiffContents.hpp"
#include "tests/support/TiffInspection.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <geotiffio.h>
#include <geovalues.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <tiffio.h>
#include <xtiffio.h>

#include <array>
#include <cmath>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

using rs2test::CommandResult;
using rs2test::FileText;
using rs2test::FolderEntries;
using rs2test::Quoted;
using rs2test::RunShell;

// The tool, quoted for the shell.
std::string Rs2() { return Quoted(RS2_TOOL); }

using rs2test::DoubleArray;
using rs2test::ReadTiff;
using rs2test::TiffContents;
using rs2test::TiffKeeper;

// A generated product in a folder of its own, with an output folder beside.
struct Product {
    explicit Product(rs2gen::ProductOptions optionsIn) : options(optionsIn) {
        generated = rs2gen::GenerateProduct(folder.Path(), options);
    }
    std::string Xml(const std::string &suffix = "") const {
        return Quoted(generated.productXml + suffix);
    }
    rs2test::TempDir folder;
    rs2test::TempDir out;
    rs2gen::ProductOptions options;
    rs2gen::GeneratedProduct generated;
};

rs2gen::ProductOptions Options(const std::string &type, int width, int height,
                               bool grid = true) {
    rs2gen::ProductOptions options;
    options.productType = type;
    options.polarizations = {"HH", "HV"};
    options.width = width;
    options.height = height;
    options.lutOffset = 3.5f;
    options.geolocationGrid = grid;
    return options;
}

// The window and output grid of an export, and where a position of the
// dataset lands in the output grid.
struct Grid {
    int x, y, w, h, bw, bh;
    std::string Arguments() const {
        return " --window " + std::to_string(x) + " " + std::to_string(y) +
               " " + std::to_string(w) + " " + std::to_string(h) + " --size " +
               std::to_string(bw) + " " + std::to_string(bh);
    }
    double Column(double pixel) const { return (pixel - x) * bw / w; }
    double Line(double line) const { return (line - y) * bh / h; }
};

// The image file's own tie points (pixel, line, longitude, latitude), as
// the generator wrote them: pixel-is-area positions.
std::vector<std::array<double, 4>> ImageTiePoints(const std::string &path) {
    TiffKeeper tiff(XTIFFOpen(path.c_str(), "r"));
    std::vector<std::array<double, 4>> points;
    if (!tiff)
        return points;
    const std::vector<double> ties =
        DoubleArray(tiff.get(), TIFFTAG_GEOTIEPOINTS);
    for (size_t i = 0; i + 6 <= ties.size(); i += 6)
        points.push_back({ties[i], ties[i + 1], ties[i + 3], ties[i + 4]});
    return points;
}

// Raster position of a map position under an affine GeoTIFF matrix.
std::array<double, 2> InverseAffine(const std::vector<double> &m, double x,
                                    double y) {
    const double dx = x - m[3];
    const double dy = y - m[7];
    const double determinant = m[0] * m[5] - m[1] * m[4];
    return {(m[5] * dx - m[1] * dy) / determinant,
            (m[0] * dy - m[4] * dx) / determinant};
}

using SampleCheck =
    std::function<void(const TiffContents &, const Product &, int x, int y,
                       int channel, size_t sample)>;

} // namespace

TEST(ExportCommand, writes_each_calibration_choice_in_its_sample_type) {
    const Product sgf(Options("SGF", 23, 11));
    const Product slc(Options("SLC", 19, 9));
    const auto sigma = [](const Product &p) {
        return rs2gen::LookupTableGains(p.options, "Sigma Nought");
    };
    struct Case {
        const Product *product;
        std::string suffix;
        uint16_t bits, format, samplesPerChannel;
        SampleCheck check;
    };
    const Case cases[] = {
        {&sgf, "", 32, SAMPLEFORMAT_INT, 1,
         [](const TiffContents &t, const Product &p, int x, int y, int c,
            size_t s) {
             EXPECT_EQ(t.Sample<int32_t>(s),
                       rs2gen::DetectedSample(p.options, c, x, y));
         }},
        {&sgf, "?c=sigma", 32, SAMPLEFORMAT_IEEEFP, 1,
         [&](const TiffContents &t, const Product &p, int x, int y, int c,
             size_t s) {
             const float dn = rs2gen::DetectedSample(p.options, c, x, y);
             const float offset =
                 rs2gen::LookupTableOffset(p.options, "Sigma Nought");
             const float expected = (dn * dn + offset) / sigma(p)[x];
             EXPECT_NEAR(t.Sample<float>(s), expected, 1e-6f * expected);
         }},
        {&slc, "", 32, SAMPLEFORMAT_COMPLEXINT, 1,
         [](const TiffContents &t, const Product &p, int x, int y, int c,
            size_t s) {
             const auto [i, q] = rs2gen::ComplexSample(p.options, c, x, y);
             EXPECT_EQ(t.Sample<int16_t>(2 * s), i);
             EXPECT_EQ(t.Sample<int16_t>(2 * s + 1), q);
         }},
        {&slc, "?c=sigma", 64, SAMPLEFORMAT_COMPLEXIEEEFP, 1,
         [&](const TiffContents &t, const Product &p, int x, int y, int c,
             size_t s) {
             const auto [i, q] = rs2gen::ComplexSample(p.options, c, x, y);
             const float gain = sigma(p)[x];
             EXPECT_NEAR(t.Sample<float>(2 * s), i / gain,
                         1e-6f * std::fabs(i / gain));
             EXPECT_NEAR(t.Sample<float>(2 * s + 1), q / gain,
                         1e-6f * std::fabs(q / gain));
         }},
    };
    for (const Case &c : cases) {
        const Product &p = *c.product;
        const std::string out = p.out.File("all.tif");
        const CommandResult result =
            RunShell(Rs2() + " export " + p.Xml(c.suffix) + " " + Quoted(out));
        ASSERT_EQ(result.exitCode, 0) << result.errors;
        const TiffContents t = ReadTiff(out);
        const std::string label = p.options.productType + c.suffix;
        ASSERT_EQ(t.width, static_cast<uint32_t>(p.options.width)) << label;
        ASSERT_EQ(t.height, static_cast<uint32_t>(p.options.height)) << label;
        EXPECT_EQ(t.bits, c.bits) << label;
        EXPECT_EQ(t.format, c.format) << label;
        ASSERT_EQ(t.samples, 2 * c.samplesPerChannel) << label;
        for (int y = 0; y < p.options.height; ++y)
            for (int x = 0; x < p.options.width; ++x)
                for (int channel = 0; channel < 2; ++channel) {
                    SCOPED_TRACE(label + " at " + std::to_string(x) + "," +
                                 std::to_string(y));
                    c.check(t, p, x, y, channel,
                            (static_cast<size_t>(y) * p.options.width + x) * 2 +
                                channel);
                }
    }
}

TEST(ExportCommand, windows_and_sizes_give_what_rs2_read_gives) {
    const Product sgf(Options("SGF", 23, 11));
    const Product slc(Options("SLC", 19, 9));
    struct Case {
        const Product *product;
        std::string suffix;
        Grid grid;
        std::string channels;
        // Read words pack I/Q; the file's complex int16 holds them apart.
        bool complexIntegers;
    };
    const Case cases[] = {
        {&sgf, "?c=sigma", {3, 2, 12, 9, 6, 5}, "2,1", false},   // decimated
        {&sgf, "", {0, 1, 5, 4, 11, 9}, "1", false},             // enlarged
        {&sgf, "?c=gamma", {20, 0, 3, 11, 3, 11}, "1,2", false}, // edge strip
        {&slc, "", {2, 1, 8, 6, 4, 12}, "2", true},              // mixed
        {&slc, "?c=sigma", {0, 0, 19, 9, 5, 3}, "1,2", false},
    };
    for (const Case &c : cases) {
        const Product &p = *c.product;
        const Grid &g = c.grid;
        const std::string label = p.options.productType + c.suffix +
                                  g.Arguments() + " --channels " + c.channels;
        const std::string out = p.out.File("window.tif");
        const CommandResult exported =
            RunShell(Rs2() + " export " + p.Xml(c.suffix) + " " + Quoted(out) +
                     g.Arguments() + " --channels " + c.channels);
        ASSERT_EQ(exported.exitCode, 0) << label << ": " << exported.errors;
        const CommandResult read =
            RunShell(Rs2() + " read --json " + p.Xml(c.suffix) + g.Arguments() +
                     " --channels " + c.channels);
        ASSERT_EQ(read.exitCode, 0) << label << ": " << read.errors;
        const nlohmann::json expected = nlohmann::json::parse(read.output);
        const TiffContents t = ReadTiff(out);
        EXPECT_EQ(t.width, static_cast<uint32_t>(g.bw)) << label;
        EXPECT_EQ(t.height, static_cast<uint32_t>(g.bh)) << label;
        const nlohmann::json &data = expected["data"];
        const bool real = expected["type"] == 4 || expected["type"] == 9;
        // Four bytes a value: a float, an int32, or a complex int16 for each
        // packed word.
        ASSERT_EQ(t.pixels.size(), data.size() * 4) << label;
        for (size_t k = 0; k < data.size(); ++k) {
            if (c.complexIntegers) {
                const auto word = static_cast<uint32_t>(data[k].get<int32_t>());
                ASSERT_EQ(t.Sample<int16_t>(2 * k),
                          static_cast<int16_t>(word & 0xFFFFu))
                    << label << " value " << k;
                ASSERT_EQ(t.Sample<int16_t>(2 * k + 1),
                          static_cast<int16_t>(word >> 16))
                    << label << " value " << k;
            } else if (real) {
                ASSERT_EQ(t.Sample<float>(k), data[k].get<float>())
                    << label << " value " << k;
            } else {
                ASSERT_EQ(t.Sample<int32_t>(k), data[k].get<int32_t>())
                    << label << " value " << k;
            }
        }
        // The host's own reader gives the export back as the dataset gave it;
        // a complex sample as its in-phase and quadrature channels.
        const CommandResult back =
            RunShell(Rs2() + " read --json " + Quoted(out) + " --window 0 0 " +
                     std::to_string(g.bw) + " " + std::to_string(g.bh));
        ASSERT_EQ(back.exitCode, 0) << label << ": " << back.errors;
        const nlohmann::json reread = nlohmann::json::parse(back.output);
        nlohmann::json written = data;
        if (c.complexIntegers) {
            written = nlohmann::json::array();
            for (const auto &value : data) {
                const auto word = static_cast<uint32_t>(value.get<int32_t>());
                written.push_back(static_cast<int16_t>(word & 0xFFFFu));
                written.push_back(static_cast<int16_t>(word >> 16));
            }
        }
        EXPECT_EQ(reread["data"], written) << label;
    }
}

TEST(ExportCommand, utm_export_puts_each_tie_point_on_its_pixel) {
    const Product sgf(Options("SGF", 60, 40));
    const auto imageTies = ImageTiePoints(sgf.generated.imageFiles[0]);
    ASSERT_GT(imageTies.size(), 10u);
    const Grid grids[] = {{0, 0, 60, 40, 60, 40},
                          {10, 5, 30, 20, 15, 40},
                          {7, 3, 41, 33, 82, 11}};
    for (const Grid &g : grids) {
        const std::string out = sgf.out.File("utm.tif");
        const CommandResult result =
            RunShell(Rs2() + " export " + sgf.Xml("?c=sigma") + " " +
                     Quoted(out) + g.Arguments());
        ASSERT_EQ(result.exitCode, 0) << result.errors;
        const TiffContents t = ReadTiff(out);
        // The scene lies at 123.5 W, 49.2 N: WGS 84 / UTM zone 10N.
        EXPECT_EQ(t.modelType, ModelTypeProjected) << g.Arguments();
        EXPECT_EQ(t.projected, 32610) << g.Arguments();
        EXPECT_EQ(t.rasterType, RasterPixelIsArea) << g.Arguments();
        ASSERT_EQ(t.matrix.size(), 16u) << g.Arguments();
        // Each tie point of the product, carried to UTM and through the
        // inverse of the file's transform, lands on its position in the
        // output grid (the affine transform fits the tie points to within
        // a few hundredths of a pixel on this scene).
        const double tolerance = 0.03 * std::max(1.0, 1.0 * g.bw / g.w);
        for (const auto &[pixel, line, longitude, latitude] : imageTies) {
            double easting = 0.0, northing = 0.0;
            ASSERT_EQ(GCTPSimpleTransform("LONG D000", longitude, latitude,
                                          "UTM 10 U D000", &easting, &northing),
                      0);
            const auto [column, row] =
                InverseAffine(t.matrix, easting, northing);
            EXPECT_NEAR(column, g.Column(pixel), tolerance)
                << g.Arguments() << " tie point " << pixel << "," << line;
            EXPECT_NEAR(row, g.Line(line), tolerance)
                << g.Arguments() << " tie point " << pixel << "," << line;
        }
        // The file's own tie points are the same points, in the same system.
        ASSERT_EQ(t.ties.size(), 6 * imageTies.size()) << g.Arguments();
        for (size_t i = 0; i < t.ties.size(); i += 6) {
            const auto [column, row] =
                InverseAffine(t.matrix, t.ties[i + 3], t.ties[i + 4]);
            EXPECT_NEAR(column, t.ties[i], tolerance) << g.Arguments();
            EXPECT_NEAR(row, t.ties[i + 1], tolerance) << g.Arguments();
        }
    }
}

TEST(ExportCommand, without_a_map_transform_tie_points_georeference_in_wgs84) {
    // Without the geolocation grid the dataset has no map transform; its
    // ground control points are those of the image file.
    const Product pixel(Options("SGF", 30, 20, false));
    const auto imageTies = ImageTiePoints(pixel.generated.imageFiles[0]);
    ASSERT_FALSE(imageTies.empty());
    const Grid grids[] = {{0, 0, 30, 20, 30, 20}, {4, 6, 20, 10, 10, 30}};
    for (const Grid &g : grids) {
        const std::string out = pixel.out.File("gcps.tif");
        const CommandResult result =
            RunShell(Rs2() + " export " + pixel.Xml() + " " + Quoted(out) +
                     g.Arguments());
        ASSERT_EQ(result.exitCode, 0) << result.errors;
        const TiffContents t = ReadTiff(out);
        EXPECT_EQ(t.modelType, ModelTypeGeographic) << g.Arguments();
        EXPECT_EQ(t.geographic, GCS_WGS_84) << g.Arguments();
        EXPECT_EQ(t.rasterType, RasterPixelIsArea) << g.Arguments();
        EXPECT_TRUE(t.matrix.empty()) << g.Arguments();
        ASSERT_EQ(t.ties.size(), 6 * imageTies.size()) << g.Arguments();
        for (size_t i = 0; i < imageTies.size(); ++i) {
            const auto &[p, l, longitude, latitude] = imageTies[i];
            EXPECT_NEAR(t.ties[6 * i], g.Column(p), 1e-9) << g.Arguments();
            EXPECT_NEAR(t.ties[6 * i + 1], g.Line(l), 1e-9) << g.Arguments();
            EXPECT_NEAR(t.ties[6 * i + 3], longitude, 1e-12);
            EXPECT_NEAR(t.ties[6 * i + 4], latitude, 1e-12);
        }
    }
}

TEST(ExportCommand, bad_usage_and_failures_leave_no_file_behind) {
    const Product sgf(Options("SGF", 24, 16));
    rs2test::TempDir empty; // a folder without product.xml
    const std::string out = Quoted(sgf.out.File("out.tif"));
    struct Case {
        std::string arguments;
        int exitCode;
        std::string message;
    };
    const Case cases[] = {
        {sgf.Xml() + " " + out + " --channels 3", 2,
         "channel 3 does not exist"},
        {sgf.Xml() + " " + out + " --channels 0,1", 2, "channel 0"},
        {sgf.Xml() + " " + out + " --size 0 5", 2, "--size"},
        {sgf.Xml() + " " + out + " --window 0 0 0 4", 2, "at least 1"},
        {sgf.Xml() + " " + out + " --window 1 2 3", 2, "--window"},
        {sgf.Xml() + " " + out + " --window 20 0 10 1", 2,
         "does not lie within the 24 x 16 raster"},
        {sgf.Xml() + " " + out + " --window -1 0 4 4", 2, "does not lie"},
        {sgf.Xml() + " " + out + " --compress jpeg", 2, "--compress"},
        {sgf.Xml() + " " + Quoted(sgf.out.File("no/folder/out.tif")), 1,
         "cannot write"},
        {sgf.Xml("?c=sigma0") + " " + out, 1, "sigma0"},
        {Quoted(empty.Path()) + " " + out, 1,
         "no product.xml in " + empty.Path()},
        {sgf.Xml(), 2, "OUT"},
    };
    for (const Case &c : cases) {
        const CommandResult result = RunShell(Rs2() + " export " + c.arguments);
        EXPECT_EQ(result.exitCode, c.exitCode) << c.arguments;
        EXPECT_NE(result.errors.find(c.message), std::string::npos)
            << c.arguments << ": " << result.errors;
        EXPECT_TRUE(FolderEntries(sgf.out.Path()).empty()) << c.arguments;
    }
}

TEST(ExportCommand, a_failed_write_exits_1_and_removes_the_partial_file) {
    const Product sgf(Options("SGF", 300, 200));
    const std::string out = sgf.out.File("big.tif");
    // Files may grow to 64 blocks of 512 bytes; the signal that would kill
    // the tool at the limit is ignored, so its writes fail instead.
    const CommandResult result =
        RunShell("ulimit -f 64; trap '' XFSZ; " + Rs2() + " export " +
                 sgf.Xml() + " " + Quoted(out));
    EXPECT_EQ(result.exitCode, 1) << result.errors;
    EXPECT_NE(result.errors.find("big.tif.part-"), std::string::npos)
        << result.errors;
    EXPECT_TRUE(FolderEntries(sgf.out.Path()).empty());
}

TEST(ExportCommand, an_interrupted_export_leaves_no_partial_file) {
    const Product sgf(Options("SGF", 24, 16));
    const std::string out = sgf.out.File("huge.tif");
    // Enlarged to 6000 x 6000 the export writes 288 MB; it is told to stop
    // as soon as its part file appears.
    const CommandResult result =
        RunShell(Rs2() + " export " + sgf.Xml() + " " + Quoted(out) +
                 " --size 6000 6000 & pid=$!; for i in $(seq 2000); do "
                 "ls " +
                 Quoted(out) +
                 ".part-* >/dev/null 2>&1 && break; sleep 0.005; done; "
                 "kill -TERM $pid; wait $pid");
    const std::vector<std::string> left = FolderEntries(sgf.out.Path());
    if (result.exitCode == 0) {
        ASSERT_EQ(left, std::vector<std::string>{"huge.tif"});
        GTEST_SKIP() << "the export finished before it was interrupted";
    }
    EXPECT_EQ(result.exitCode, 128 + SIGTERM); // ended by the signal
    EXPECT_TRUE(left.empty()) << left.front();
}

TEST(ExportCommand, draws_progress_only_on_a_terminal) {
    const Product sgf(Options("SGF", 24, 16));
    const std::string out = sgf.out.File("plain.tif");
    const CommandResult plain =
        RunShell(Rs2() + " export " + sgf.Xml() + " " + Quoted(out));
    ASSERT_EQ(plain.exitCode, 0);
    EXPECT_EQ(plain.errors, "");
    EXPECT_EQ(plain.output, out + ": 24 x 16 pixels, 2 channel(s) of int32\n");
    if (std::system("command -v script >/dev/null 2>&1") != 0)
        GTEST_SKIP() << "no script(1) to give the tool a terminal";
    // script(1) runs the tool on a pseudo-terminal and copies what it shows.
    const std::string inner = Rs2() + " export " + sgf.Xml() + " " +
                              Quoted(sgf.out.File("terminal.tif"));
    const CommandResult terminal =
        RunShell("script -qec \"" + inner + "\" /dev/null");
    ASSERT_EQ(terminal.exitCode, 0) << terminal.errors;
    EXPECT_NE(terminal.output.find("] 100%"), std::string::npos)
        << terminal.output;
}

// GDAL, reading what rs2 writes, names each band by its polarization and
// finds the product's identity, the units and the nodata value.
TEST(ExportCommand, gdal_reads_the_bands_and_metadata_an_export_declares) {
    const Product sgf(Options("SGF", 23, 11));
    const Product slc(Options("SLC", 19, 9));
    struct Case {
        const Product *product;
        std::string arguments;
        std::string type, units, calibration;
        bool nanIsNoData;
        std::string compression; // as GDAL names it; empty: none
    };
    const Case cases[] = {
        {&sgf, "", "Int32", "DN", "None", false, ""},
        {&sgf, "?c=sigma --denoise --db --compress deflate", "Float32", "dB",
         "Sigma0", true, "DEFLATE"},
        {&sgf, "?c=beta --looks 2x2 --compress zstd", "Float32", "linear",
         "Beta0", false, "ZSTD"},
        {&sgf, " --looks 2x1", "Float32", "DN^2", "None", false, ""},
        {&slc, " --channels 2 --compress lzw", "CInt16", "DN", "None", false,
         "LZW"},
        {&slc, "?c=gamma --compress none", "CFloat32", "linear", "Gamma", false,
         ""},
    };
    for (const Case &c : cases) {
        const Product &p = *c.product;
        const std::string label = p.options.productType + c.arguments;
        const std::string out = p.out.File("described.tif");
        const std::string name = c.arguments.substr(0, c.arguments.find(' '));
        const std::string options = c.arguments.substr(name.size());
        const CommandResult result = RunShell(Rs2() + " export " + p.Xml(name) +
                                              " " + Quoted(out) + options);
        ASSERT_EQ(result.exitCode, 0) << label << ": " << result.errors;
        const CommandResult info = RunShell("gdalinfo -json " + Quoted(out));
        ASSERT_EQ(info.exitCode, 0) << label << ": " << info.errors;
        const auto json = nlohmann::json::parse(info.output);
        const auto &structure = json["metadata"]["IMAGE_STRUCTURE"];
        EXPECT_EQ(structure.value("COMPRESSION", ""), c.compression) << label;
        const auto &items = json["metadata"][""];
        EXPECT_EQ(items.value("UNITS", ""), c.units) << label;
        EXPECT_EQ(items.value("CALIBRATION", ""), c.calibration) << label;
        EXPECT_EQ(items.value("PRODUCT_TYPE", ""), p.options.productType)
            << label;
        EXPECT_EQ(items.value("SATELLITE", ""), "RADARSAT-2") << label;
        const std::vector<std::string> expected =
            options.find("--channels 2") != std::string::npos
                ? std::vector<std::string>{"HV"}
                : p.options.polarizations;
        ASSERT_EQ(json["bands"].size(), expected.size()) << label;
        for (size_t band = 0; band < expected.size(); ++band) {
            const auto &b = json["bands"][band];
            EXPECT_EQ(b.value("type", ""), c.type) << label;
            EXPECT_EQ(b["block"], nlohmann::json::array({512, 512})) << label;
            EXPECT_EQ(b.value("description", ""), expected[band]) << label;
            EXPECT_EQ(b["metadata"][""].value("POLARIZATION", ""),
                      expected[band])
                << label;
            EXPECT_EQ(b.contains("noDataValue"), c.nanIsNoData) << label;
            if (c.nanIsNoData) {
                EXPECT_EQ(b["noDataValue"], "NaN") << label;
            }
        }
    }
}

TEST(ExportCommand, product_folders_are_names_of_their_product) {
    const Product sgf(Options("SGF", 24, 16));
    const std::string folder = sgf.folder.Path();
    const std::string xml = sgf.generated.productXml;
    const std::pair<std::string, std::string> cases[] = {
        {folder, xml},
        {folder + "/", xml},
        {folder + "?c=sigma", xml + "?c=sigma"},
        {folder + ":Calibration Type:Beta Nought",
         xml + ":Calibration Type:Beta Nought"},
    };
    for (const auto &[name, sameAs] : cases) {
        const host::Raster byFolder = host::OpenRaster(name);
        const host::Raster byFile = host::OpenRaster(sameAs);
        EXPECT_EQ(byFolder.Name(), byFile.Name()) << name;
        EXPECT_EQ(byFolder.ChannelType(1), byFile.ChannelType(1)) << name;
    }
    rs2test::TempDir empty;
    try {
        host::OpenRaster(empty.Path() + "?c=sigma");
        ADD_FAILURE() << "opened a folder without product.xml";
    } catch (const host::Error &error) {
        EXPECT_EQ(std::string(error.what()),
                  "no product.xml in " + empty.Path());
    }
    // The tool takes the folder form too, and writes the same file.
    const std::string byFolder = sgf.out.File("folder.tif");
    const std::string byFile = sgf.out.File("file.tif");
    ASSERT_EQ(RunShell(Rs2() + " export " + Quoted(folder + "?c=sigma") + " " +
                       Quoted(byFolder))
                  .exitCode,
              0);
    ASSERT_EQ(RunShell(Rs2() + " export " + sgf.Xml("?c=sigma") + " " +
                       Quoted(byFile))
                  .exitCode,
              0);
    EXPECT_EQ(FileText(byFolder), FileText(byFile));
}

TEST(RasterBandReads, need_room_for_the_whole_read) {
    const Product slc(Options("SLC", 8, 6));
    const host::Raster calibrated =
        host::OpenRaster(slc.generated.productXml + "?c=sigma");
    const host::Raster raw = host::OpenRaster(slc.generated.productXml);
    const host::Window window{1, 1, 4, 3};
    const std::vector<int32_t> channels{1, 2};
    // 4 x 3 pixels of two channels: 24 words, or 48 floats of complex data.
    std::vector<float> reals(48, -1.0f);
    EXPECT_THROW(
        calibrated.ReadReal32Into(window, 4, 3, channels, reals.data(), 47),
        host::Error);
    EXPECT_EQ(reals.back(), -1.0f); // nothing written
    calibrated.ReadReal32Into(window, 4, 3, channels, reals.data(), 48);
    EXPECT_EQ(reals, calibrated.ReadReal32(window, 4, 3, channels));
    std::vector<int32_t> words(24, -1);
    EXPECT_THROW(raw.ReadInt32Into(window, 4, 3, channels, words.data(), 23),
                 host::Error);
    raw.ReadInt32Into(window, 4, 3, channels, words.data(), 24);
    EXPECT_EQ(words, raw.ReadInt32(window, 4, 3, channels));
    // Raw complex samples read as reals are in-phase/quadrature pairs as
    // well: the buffer must hold two floats a sample.
    const std::vector<float> pairs = raw.ReadReal32(window, 4, 3, channels);
    ASSERT_EQ(pairs.size(), 48u);
    const auto [i, q] = rs2gen::ComplexSample(slc.options, 1, 1, 1);
    EXPECT_EQ(pairs[2], i);
    EXPECT_EQ(pairs[3], q);
}
