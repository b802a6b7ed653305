// The real RADARSAT-2 product of shared/realdata, through the host API as a
// program sees it. The expected values are worked out here from the texts of
// product.xml, read with a scan of our own, and the rules of each value; the
// comments give the arithmetic for this product.

#include "host/ModelSegments.hpp"
#include "host/ProjectionServices.hpp"
#include "host/Raster.hpp"
#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace {

const std::string kFolder =
    RS2_SOURCE_DIR "/../shared/realdata/rs2_slc_f0w2_hh_20170430";
const std::string kProductXml = kFolder + "/product.xml";

bool ProductPresent() {
    struct stat info {};
    return stat(kProductXml.c_str(), &info) == 0;
}

// The texts of every element named tag, in document order: what stands
// between its start tag and the next end tag of that name. Enough for the
// elements read here, none of which nests in an element of its own name.
std::vector<std::string> ElementTexts(const std::string &xml,
                                      const std::string &tag) {
    std::vector<std::string> texts;
    const std::string open = "<" + tag;
    const std::string close = "</" + tag + ">";
    for (size_t at = xml.find(open); at != std::string::npos;
         at = xml.find(open, at + 1)) {
        const char next = xml[at + open.size()];
        if (next != '>' && next != ' ')
            continue; // a longer name that starts with tag
        const size_t start = xml.find('>', at) + 1;
        const size_t end = xml.find(close, start);
        texts.push_back(xml.substr(start, end - start));
        at = end;
    }
    return texts;
}

std::string FirstText(const std::string &xml, const std::string &tag) {
    const std::vector<std::string> texts = ElementTexts(xml, tag);
    return texts.empty() ? std::string() : texts.front();
}

template <typename... Values>
std::string Format(const char *format, Values... values) {
    char text[256];
    std::snprintf(text, sizeof text, format, values...);
    return text;
}

double Number(const std::string &text) { return std::atof(text.c_str()); }

std::vector<double> Numbers(const std::string &text) {
    std::vector<double> numbers;
    std::istringstream in(text);
    for (std::string piece; std::getline(in, piece, ' ');)
        numbers.push_back(Number(piece));
    return numbers;
}

// (h * 60 + m) * 60 + s of a date-time text.
double SecondsOfDay(const std::string &dateTime) {
    const int hours = std::atoi(dateTime.substr(11, 2).c_str());
    const int minutes = std::atoi(dateTime.substr(14, 2).c_str());
    return (hours * 60 + minutes) * 60 + Number(dateTime.substr(17));
}

struct TiePoint {
    double line, pixel, latitude, longitude, height;
};

std::vector<TiePoint> TiePoints(const std::string &xml) {
    std::vector<TiePoint> points;
    for (const std::string &block : ElementTexts(xml, "imageTiePoint"))
        points.push_back({Number(FirstText(block, "line")),
                          Number(FirstText(block, "pixel")),
                          Number(FirstText(block, "latitude")),
                          Number(FirstText(block, "longitude")),
                          Number(FirstText(block, "height"))});
    return points;
}

std::string Value(const host::Entries &entries, const std::string &key) {
    for (const auto &[name, value] : entries)
        if (name == key)
            return value;
    ADD_FAILURE() << "no entry " << key;
    return "";
}

// One dataset of the product for the whole suite: opening it parses three
// large files.
class RealProduct : public ::testing::Test {
  protected:
    static void SetUpTestSuite() {
        if (!ProductPresent())
            return;
        xml = std::make_unique<std::string>(rs2test::FileText(kProductXml));
        try {
            raster = std::make_unique<host::Raster>(host::OpenRaster(kFolder));
        } catch (const host::Error &error) {
            openFailure = error.what();
        }
    }
    static void TearDownTestSuite() {
        raster.reset();
        xml.reset();
    }
    void SetUp() override {
        if (!ProductPresent())
            GTEST_SKIP() << kProductXml << " is not there";
        ASSERT_NE(raster, nullptr) << openFailure;
    }

    static inline std::unique_ptr<std::string> xml;
    static inline std::unique_ptr<host::Raster> raster;
    static inline std::string openFailure;
};

struct RecordDeleter {
    void operator()(RFInfo_t *record) const { RFDeallocate(record); }
};

} // namespace

TEST_F(RealProduct, derived_metadata_follows_the_rules) {
    const host::Entries metadata = raster->Metadata(1);
    // SLC far edge: (N - 1) * dx + R0 with the rewritten texts:
    // N = 18465, dx = "%.3lf" of 4.73307896 = 4.733,
    // R0 = "%.4lf" of 915728.7974741652 = 915728.7975;
    // 18464 * 4.733 + 915728.7975 = 87390.112 + 915728.7975 = 1003118.9095.
    const std::string nearEdge =
        Format("%.4lf", Number(FirstText(*xml, "slantRangeNearEdge")));
    const std::string spacing =
        Format("%.3lf", Number(FirstText(*xml, "sampledPixelSpacing")));
    const std::string farEdge =
        Format("%.4lf", (Number(FirstText(*xml, "numberOfSamplesPerLine")) -
                         1) * Number(spacing) +
                            Number(nearEdge));
    // 299792458 / 5.404999242769673e9 = 0.05546577243...
    const std::string wavelength = Format(
        "%g", 299792458.0 / Number(FirstText(*xml, "radarCenterFrequency")));
    // t1 = 08:43:16.790276 = 31396.790276 s, t2 = 08:42:53.864993 =
    // 31373.864993 s; mid = 31385.3276345 = 08:43:05.3276345, printed with
    // six decimals (the double is 31385.32763449...): 08:43:05.327634Z, no
    // trailing zero to remove; the date is that of rawDataStartTime.
    const double mid =
        (SecondsOfDay(FirstText(*xml, "zeroDopplerTimeFirstLine")) +
         SecondsOfDay(FirstText(*xml, "zeroDopplerTimeLastLine"))) *
        0.5;
    const int hours = static_cast<int>(mid / 60 / 60);
    const int minutes = static_cast<int>((mid - hours * 3600) / 60);
    const std::string acquired =
        FirstText(*xml, "rawDataStartTime").substr(0, 10) + "T" +
        Format("%02d:%02d:%09.6fZ", hours, minutes,
               mid - hours * 3600 - minutes * 60);

    struct Case {
        const char *key;
        std::string fromRules;
        const char *byHand;
    } cases[] = {
        {"SlantRangeNearEdge", nearEdge, "915728.7975"},
        {"SlantRangeFarEdge", farEdge, "1003118.9095"},
        {"RadarCenterWavelength", wavelength, "0.0554658"},
        {"Acquisition_DateTime", acquired, "2017-04-30T08:43:05.327634Z"},
        // Pixels run from near to far range (pixelTimeOrdering Increasing).
        {"RangeDistFirstpixel", nearEdge, "915728.7975"},
        {"RangeDistLastpixel", farEdge, "1003118.9095"},
    };
    for (const Case &c : cases) {
        EXPECT_EQ(c.fromRules, c.byHand) << c.key;
        EXPECT_EQ(Value(metadata, c.key), c.byHand) << c.key;
    }
}

TEST_F(RealProduct, geolocation_grid_and_state_vectors_are_listed_whole) {
    const host::Entries metadata = raster->Metadata(1);
    // Latitude, longitude, height, line, pixel of each tie point.
    const std::vector<TiePoint> ties = TiePoints(*xml);
    ASSERT_EQ(ties.size(), 1364u); // 44 per grid line, 31 grid lines
    std::string grid;
    for (const TiePoint &t : ties)
        grid += Format("%f;%f;%f;%f;%f;", t.latitude, t.longitude, t.height,
                       t.line, t.pixel);
    EXPECT_EQ(Value(metadata, "GeolocationGrid"), grid);
    EXPECT_EQ(std::count(grid.begin(), grid.end(), ';'), 5 * 1364);

    // The seven texts of each state vector as written, each with its ';'.
    std::string positions;
    const char *const fields[] = {"timeStamp", "xPosition", "yPosition",
                                  "zPosition", "xVelocity", "yVelocity",
                                  "zVelocity"};
    const std::vector<std::string> vectors = ElementTexts(*xml, "stateVector");
    ASSERT_EQ(vectors.size(), 5u);
    for (const std::string &vector : vectors)
        for (const char *field : fields)
            positions += FirstText(vector, field) + ";";
    EXPECT_EQ(Value(metadata, "SatPositions"), positions);
}

TEST_F(RealProduct, text_segment_holds_every_line_of_the_description) {
    std::vector<std::string> lines;
    std::istringstream in(*xml);
    for (std::string line; std::getline(in, line);)
        lines.push_back(line);
    // The file ends with a newline after its 15297th line.
    ASSERT_EQ(std::count(xml->begin(), xml->end(), '\n'), 15297);
    ASSERT_EQ(lines.size(), 15297u);
    EXPECT_EQ(raster->TextLines(), lines);
}

TEST_F(RealProduct, tie_points_thin_to_228_ground_control_points) {
    const std::vector<TiePoint> ties = TiePoints(*xml);
    // step = (1364 + 255) / 256 = 6; points 0, 6, ..., 1362: 1362 / 6 + 1
    const host::GcpSet gcps = raster->GroundControlPoints();
    ASSERT_EQ(gcps.points.size(), 228u);
    EXPECT_EQ(gcps.pixelUnits, "PIXEL");
    EXPECT_EQ(gcps.groundGeosys, "LONG      WGS84");
    for (size_t k = 0; k < gcps.points.size(); ++k) {
        const TiePoint &tie = ties[6 * k];
        const host::GroundControlPoint &gcp = gcps.points[k];
        EXPECT_EQ(gcp.id, static_cast<int32_t>(k + 1));
        // Raster positions: the centre of the first pixel is at 0.5.
        EXPECT_EQ(gcp.pixel, tie.pixel + 0.5) << k;
        EXPECT_EQ(gcp.line, tie.line + 0.5) << k;
        EXPECT_EQ(gcp.x, tie.longitude) << k;
        EXPECT_EQ(gcp.y, tie.latitude) << k;
        EXPECT_EQ(gcp.z, tie.height) << k;
    }
}

TEST_F(RealProduct, projection_is_utm_in_the_zone_of_the_first_tie_point) {
    const TiePoint first = TiePoints(*xml).front();
    // Longitude 147.776: zone floor((147.776 + 180) / 6) + 1 = 55; latitude
    // -25.978: band floor((-25.978 + 80) / 8) = 6 of "CDEFGHJKLM...", J.
    ASSERT_NEAR(first.longitude, 147.776, 1e-3);
    ASSERT_NEAR(first.latitude, -25.978, 1e-3);
    const ProjInfo_t projection = raster->Projection();
    EXPECT_STREQ(projection.geosys, "UTM 55 J D000");
    EXPECT_EQ(raster->ProjectionCode(), kGeosysUTM);
}

TEST_F(RealProduct, rpc_block_carries_the_coefficients_of_the_product) {
    const std::vector<unsigned char> block = raster->BinarySegment();
    ASSERT_EQ(block.size(), static_cast<size_t>(kRFBlockSize));
    std::unique_ptr<RFInfo_t, RecordDeleter> rpc(
        VXBBinaryToRFInfo(block.data(), kRFBlockSize));
    ASSERT_NE(rpc, nullptr);
    EXPECT_STREQ(rpc->sensorName, "RADARSAT-2");
    EXPECT_EQ(rpc->width, 18465);
    EXPECT_EQ(rpc->height, 30466);
    const struct {
        const char *tag;
        double value;
    } values[] = {
        {"lineOffset", rpc->lineOffset},
        {"pixelOffset", rpc->pixelOffset},
        {"latitudeOffset", rpc->latitudeOffset},
        {"longitudeOffset", rpc->longitudeOffset},
        {"heightOffset", rpc->heightOffset},
        {"lineScale", rpc->lineScale},
        {"pixelScale", rpc->pixelScale},
        {"latitudeScale", rpc->latitudeScale},
        {"longitudeScale", rpc->longitudeScale},
        {"heightScale", rpc->heightScale},
    };
    for (const auto &v : values)
        EXPECT_EQ(v.value, Number(FirstText(*xml, v.tag))) << v.tag;
    const struct {
        const char *tag;
        const double *coefficients;
    } polynomials[] = {
        {"lineNumeratorCoefficients", rpc->lineNumeratorCoefficients},
        {"lineDenominatorCoefficients", rpc->lineDenominatorCoefficients},
        {"pixelNumeratorCoefficients", rpc->pixelNumeratorCoefficients},
        {"pixelDenominatorCoefficients", rpc->pixelDenominatorCoefficients},
    };
    for (const auto &p : polynomials) {
        const std::vector<double> expected = Numbers(FirstText(*xml, p.tag));
        ASSERT_EQ(expected.size(), 20u) << p.tag;
        for (size_t i = 0; i < expected.size(); ++i)
            EXPECT_EQ(p.coefficients[i], expected[i]) << p.tag << " " << i;
    }
}

TEST_F(RealProduct, orbit_holds_every_state_vector) {
    ASSERT_TRUE(raster->HasOrbit());
    const host::OrbitRecord orbit = raster->Orbit();
    const std::vector<std::string> vectors = ElementTexts(*xml, "stateVector");
    ASSERT_EQ(orbit.stateVectors.size(), vectors.size());
    for (size_t i = 0; i < vectors.size(); ++i) {
        const StateVector_t &got = orbit.stateVectors[i];
        const std::string &text = vectors[i];
        const std::string time = FirstText(text, "timeStamp");
        EXPECT_STREQ(got.time, time.c_str()) << i;
        EXPECT_NEAR(got.seconds, SecondsOfDay(time), 1e-9) << i;
        const char *const axes[] = {"x", "y", "z"};
        for (int a = 0; a < 3; ++a) {
            const std::string axis = axes[a];
            EXPECT_EQ(got.position[a],
                      Number(FirstText(text, axis + "Position")))
                << i << " " << axis;
            EXPECT_EQ(got.velocity[a],
                      Number(FirstText(text, axis + "Velocity")))
                << i << " " << axis;
        }
    }
}

TEST_F(RealProduct, fitted_transform_reproduces_the_tie_points) {
    const ProjInfo_t projection = raster->Projection();
    const double *t = projection.transform;
    const std::vector<TiePoint> ties = TiePoints(*xml);
    // Distance on the map between a tie point and where the transform puts
    // the centre of its pixel, (pixel + 0.5, line + 0.5) as a raster position.
    std::vector<double> residuals;
    for (const TiePoint &tie : ties) {
        double easting = 0.0;
        double northing = 0.0;
        ASSERT_EQ(GCTPSimpleTransform("LONG D000", tie.longitude, tie.latitude,
                                      projection.geosys, &easting, &northing),
                  0);
        const double column = tie.pixel + 0.5;
        const double line = tie.line + 0.5;
        residuals.push_back(
            std::hypot(t[0] + column * t[1] + line * t[2] - easting,
                       t[3] + column * t[4] + line * t[5] - northing));
    }
    double sumOfSquares = 0.0;
    for (double residual : residuals)
        sumOfSquares += residual * residual;
    const double worst = *std::max_element(residuals.begin(), residuals.end());
    const double rms = std::sqrt(sumOfSquares / residuals.size());

    // The transform is the plane through three image corners: tie points 0,
    // 43 and 1320 of the grid of 44 points per line. At those corners it
    // must meet the tie points to well under half a pixel (some 4 m on the
    // ground across the track, 2.5 m along it), or the pixel convention is
    // off.
    for (size_t corner : {0, 43, 1320})
        EXPECT_LT(residuals[corner], 1.0) << corner;
    // Elsewhere no affine map can follow this image: its columns are spaced
    // evenly in slant range, so on the ground they spread out toward far
    // range, and along one image line the tie points leave the straight line
    // between its ends by some 4 km. The bounds are those of such a plane.
    EXPECT_LT(worst, 5000.0);
    EXPECT_LT(rms, 3500.0);

    // rs2 info reports the same misfit, to the few centimetres the six
    // decimals of a degree in its GeolocationGrid entry keep.
    const rs2test::CommandResult info = rs2test::RunShell(
        rs2test::Quoted(RS2_TOOL) + " info --json " + rs2test::Quoted(kFolder));
    ASSERT_EQ(info.exitCode, 0) << info.errors;
    const nlohmann::json misfit =
        nlohmann::json::parse(info.output)["affine_misfit"];
    ASSERT_TRUE(misfit.is_object()) << misfit;
    EXPECT_NEAR(misfit["max_m"].get<double>(), worst, 0.2);
    EXPECT_NEAR(misfit["rms_m"].get<double>(), rms, 0.2);
    EXPECT_EQ(misfit["tie_points"].get<size_t>(), ties.size());
}

// So no transform may stand for it in an export: GDAL finds every tie point
// as a control point, no geotransform, and the RPC model, which this
// product's tie points agree with.
TEST_F(RealProduct, export_is_placed_by_every_tie_point_and_the_rpc_model) {
    rs2test::TempDir out;
    const std::string file = out.File("sigma.tif");
    const rs2test::CommandResult result =
        rs2test::RunShell(rs2test::Quoted(RS2_TOOL) + " export " +
                          rs2test::Quoted(kProductXml + "?c=sigma") + " " +
                          rs2test::Quoted(file) + " --size 1847 3047");
    ASSERT_EQ(result.exitCode, 0) << result.errors;
    const rs2test::CommandResult info =
        rs2test::RunShell("gdalinfo " + rs2test::Quoted(file));
    ASSERT_EQ(info.exitCode, 0) << info.errors;
    size_t gcps = 0;
    for (size_t at = info.output.find("GCP["); at != std::string::npos;
         at = info.output.find("GCP[", at + 1))
        ++gcps;
    EXPECT_EQ(gcps, TiePoints(*xml).size());
    EXPECT_EQ(info.output.find("GeoTransform"), std::string::npos);
    EXPECT_NE(info.output.find("RPC Metadata"), std::string::npos);
}

TEST_F(RealProduct, opens_under_every_calibration_choice) {
    // Complex samples: 7 (complex int16) raw, 9 (complex float32) calibrated.
    struct Case {
        const char *choice;
        int32_t type;
        const char *calibration;
    } cases[] = {
        {"none", 7, "None"},
        {"sigma", 9, "Sigma0"},
        {"beta", 9, "Beta0"},
        {"gamma", 9, "Gamma"},
    };
    for (const Case &c : cases) {
        const host::Raster opened =
            host::OpenRaster(kProductXml + "?c=" + c.choice);
        EXPECT_EQ(opened.ChannelType(1), c.type) << c.choice;
        EXPECT_EQ(opened.Width(), 18465) << c.choice;
        EXPECT_EQ(opened.Height(), 30466) << c.choice;
        EXPECT_EQ(Value(opened.Metadata(1), "SAR_Calibration"), c.calibration)
            << c.choice;
    }
}
