// rs2 footprint end to end: the outline against the tie points of
// product.xml, read here with a parser of our own, and the KML against the
// GeoJSON.

#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <xercesc/dom/DOM.hpp>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/parsers/XercesDOMParser.hpp>
#include <xercesc/sax/HandlerBase.hpp>
#include <xercesc/util/PlatformUtils.hpp>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <memory>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace {

using rs2test::CommandResult;
using rs2test::Quoted;

CommandResult Footprint(const std::string &arguments) {
    return rs2test::RunShell(Quoted(RS2_TOOL) + " footprint " + arguments);
}

// An XML text parsed whole; malformed XML throws from the constructor.
class XmlDocument {
  public:
    explicit XmlDocument(const std::string &xml) {
        parser.setErrorHandler(&throwOnFatalError);
        parser.parse(xercesc::MemBufInputSource(
            reinterpret_cast<const XMLByte *>(xml.data()), xml.size(), "xml"));
    }
    // The texts of the elements named tag, in document order.
    std::vector<std::string> Texts(const char *tag) const {
        const std::unique_ptr<XMLCh, void (*)(XMLCh *)> wide(
            xercesc::XMLString::transcode(tag),
            [](XMLCh *p) { xercesc::XMLString::release(&p); });
        const xercesc::DOMNodeList *nodes =
            parser.getDocument()->getElementsByTagName(wide.get());
        std::vector<std::string> texts;
        for (XMLSize_t i = 0; i < nodes->getLength(); ++i) {
            const std::unique_ptr<char, void (*)(char *)> narrow(
                xercesc::XMLString::transcode(nodes->item(i)->getTextContent()),
                [](char *p) { xercesc::XMLString::release(&p); });
            texts.push_back(narrow.get());
        }
        return texts;
    }

  private:
    // Up before the parser is made, down after it is gone.
    struct Platform {
        Platform() { xercesc::XMLPlatformUtils::Initialize(); }
        ~Platform() { xercesc::XMLPlatformUtils::Terminate(); }
    } platform;
    xercesc::HandlerBase throwOnFatalError;
    mutable xercesc::XercesDOMParser parser;
};

struct Point {
    double longitude, latitude;
};

// The corner tie points of the grid of product.xml and its size in tie
// points. Only tie points hold line, pixel, latitude and longitude
// elements.
struct Grid {
    std::vector<Point> corners;
    size_t columns = 0, rows = 0;
};

Grid GridOf(const std::string &productXml) {
    const XmlDocument document(rs2test::FileText(productXml));
    const auto numbers = [&](const char *tag) {
        std::vector<double> values;
        for (const std::string &text : document.Texts(tag))
            values.push_back(std::stod(text));
        return values;
    };
    const std::vector<double> lines = numbers("line"),
                              pixels = numbers("pixel"),
                              lats = numbers("latitude"),
                              lons = numbers("longitude");
    const auto [top, bottom] = std::minmax_element(lines.begin(), lines.end());
    const auto [left, right] =
        std::minmax_element(pixels.begin(), pixels.end());
    Grid grid;
    grid.columns = size_t(std::count(lines.begin(), lines.end(), *top));
    grid.rows = lines.size() / grid.columns;
    for (const auto &[line, pixel] : {std::pair(*top, *left),
                                      {*top, *right},
                                      {*bottom, *right},
                                      {*bottom, *left}})
        for (size_t i = 0; i < lines.size(); ++i)
            if (lines[i] == line && pixels[i] == pixel)
                grid.corners.push_back({lons[i], lats[i]});
    return grid;
}

// Twice the enclosed area, positive for a counter-clockwise ring.
double SignedDoubleArea(const std::vector<Point> &ring) {
    double area = 0.0;
    for (size_t i = 1; i < ring.size(); ++i)
        area += (ring[i - 1].longitude - ring[i].longitude) *
                (ring[i - 1].latitude + ring[i].latitude);
    return area;
}

// The parts of a GeoJSON Polygon or MultiPolygon, checked to be closed,
// counter-clockwise rings of longitudes within [-180, 180].
std::vector<std::vector<Point>> CheckedParts(const nlohmann::json &geometry) {
    const nlohmann::json polygons =
        geometry["type"] == "Polygon"
            ? nlohmann::json::array({geometry["coordinates"]})
            : geometry["coordinates"];
    std::vector<std::vector<Point>> parts;
    for (const nlohmann::json &polygon : polygons) {
        std::vector<Point> ring;
        for (const nlohmann::json &pair : polygon[0]) {
            ring.push_back({pair[0].get<double>(), pair[1].get<double>()});
            EXPECT_LE(std::abs(ring.back().longitude), 180.0);
        }
        EXPECT_EQ(ring.front().longitude, ring.back().longitude);
        EXPECT_EQ(ring.front().latitude, ring.back().latitude);
        EXPECT_GT(SignedDoubleArea(ring), 0.0);
        parts.push_back(ring);
    }
    return parts;
}

// Expects the grid's corners among the points, east of the antimeridian
// counted from -180, to the six decimals of the driver's grid.
void ExpectCorners(const std::vector<Point> &points, const Grid &grid) {
    ASSERT_EQ(grid.corners.size(), 4u);
    for (Point corner : grid.corners) {
        corner.longitude -= corner.longitude > 180.0 ? 360.0 : 0.0;
        EXPECT_TRUE(std::any_of(
            points.begin(), points.end(),
            [&](auto &p) {
                return std::abs(p.longitude - corner.longitude) < 1e-6 &&
                       std::abs(p.latitude - corner.latitude) < 1e-6;
            }))
            << corner.longitude << " " << corner.latitude;
    }
}

} // namespace

TEST(FootprintCommand, outlines_the_grid_border_in_geojson_and_kml) {
    const struct {
        const char *what;
        bool pixelTimeDecreasing; // mirrors the scene: the other winding
        double centerLongitude;
        size_t parts;
    } cases[] = {{"near range first", false, -123.5, 1},
                 {"far range first", true, -123.5, 1},
                 {"across the antimeridian", false, 180.0, 2}};
    for (const auto &c : cases) {
        SCOPED_TRACE(c.what);
        rs2test::TempDir folder;
        rs2gen::ProductOptions options;
        options.tieGridColumns = 5;
        options.tieGridRows = 4;
        options.pixelTimeDecreasing = c.pixelTimeDecreasing;
        options.centerLongitude = c.centerLongitude;
        const std::string xml =
            rs2gen::GenerateProduct(folder.Path(), options).productXml;
        const Grid grid = GridOf(xml);

        const CommandResult json = Footprint(Quoted(folder.Path()));
        ASSERT_EQ(json.exitCode, 0) << json.errors;
        const nlohmann::json feature = nlohmann::json::parse(json.output);
        const std::string firstLine = XmlDocument(rs2test::FileText(xml))
                                          .Texts("zeroDopplerTimeFirstLine")
                                          .at(0);
        EXPECT_EQ(feature["properties"]["product_id"], "PDS_00000001");
        EXPECT_EQ(feature["properties"]["product_type"], "SGF");
        EXPECT_EQ(feature["properties"]["first_line_time"], firstLine);
        const auto parts = CheckedParts(feature["geometry"]);
        ASSERT_EQ(parts.size(), c.parts);
        std::vector<Point> points;
        for (const std::vector<Point> &part : parts)
            points.insert(points.end(), part.begin(), part.end());
        ExpectCorners(points, grid);
        if (c.parts == 1) { // the border's tie points, the first one twice
            EXPECT_EQ(points.size(), 2 * (grid.columns + grid.rows) - 3);
        }

        const CommandResult kml = Footprint(Quoted(xml) + " --format KML");
        ASSERT_EQ(kml.exitCode, 0) << kml.errors;
        const XmlDocument placemark(kml.output);
        EXPECT_EQ(placemark.Texts("name").at(0), "PDS_00000001");
        EXPECT_EQ(placemark.Texts("when").at(0), firstLine);
        std::string tuples;
        for (const std::string &text : placemark.Texts("coordinates"))
            tuples += text + " ";
        std::replace(tuples.begin(), tuples.end(), ',', ' ');
        std::istringstream in(tuples);
        for (const Point &point : points) {
            double longitude = NAN, latitude = NAN, height = NAN;
            in >> longitude >> latitude >> height;
            EXPECT_EQ(longitude, point.longitude);
            EXPECT_EQ(latitude, point.latitude);
            EXPECT_EQ(height, 0.0);
        }
        EXPECT_FALSE(in >> tuples) << "more KML points than GeoJSON ones";
    }
}

TEST(FootprintCommand, refuses_what_it_cannot_outline) {
    const struct {
        const char *what;
        bool geolocationGrid;
        int tieGridRows;
        const char *arguments;
        int exitCode;
        const char *message;
    } cases[] = {
        {"no grid", false, 4, "", 1, "no geolocation grid"},
        {"one grid line", true, 1, "", 1, "at least two lines"},
        {"unknown format", true, 4, "--format gml", 2, "--format"},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.what);
        rs2test::TempDir folder;
        rs2gen::ProductOptions options;
        options.geolocationGrid = c.geolocationGrid;
        options.tieGridRows = c.tieGridRows;
        rs2gen::GenerateProduct(folder.Path(), options);
        const CommandResult result =
            Footprint(Quoted(folder.Path()) + " " + c.arguments);
        EXPECT_EQ(result.exitCode, c.exitCode);
        EXPECT_TRUE(result.output.empty());
        EXPECT_EQ(result.errors.rfind("rs2: ", 0), 0u) << result.errors;
        EXPECT_NE(result.errors.find(c.message), std::string::npos)
            << result.errors;
        EXPECT_EQ(std::count(result.errors.begin(), result.errors.end(), '\n'),
                  1);
    }
}

TEST(FootprintCommand, keeps_any_product_id_well_formed) {
    rs2test::TempDir folder;
    const std::string xml =
        rs2gen::GenerateProduct(folder.Path(), rs2gen::ProductOptions())
            .productXml;
    // A Latin-1 product description whose id holds a letter beyond ASCII
    // and the characters of markup.
    std::string text = rs2test::FileText(xml);
    text.replace(text.find("UTF-8"), 5, "ISO-8859-1");
    text.replace(text.find("PDS_00000001"), 12, "PDS_\xE9&lt;&amp;&gt;\"");
    std::ofstream(xml, std::ios::binary) << text;

    const CommandResult json = Footprint(Quoted(xml));
    ASSERT_EQ(json.exitCode, 0) << json.errors;
    EXPECT_EQ(nlohmann::json::parse(json.output)["properties"]["product_id"],
              "PDS_\u00E9<&>\"");
    const CommandResult kml = Footprint(Quoted(xml) + " --format kml");
    ASSERT_EQ(kml.exitCode, 0) << kml.errors;
    EXPECT_EQ(XmlDocument(kml.output).Texts("name").at(0), "PDS_\u00E9<&>\"");
}

TEST(FootprintCommand, outlines_the_real_product_by_its_grid_corners) {
    const std::string xml = RS2_SOURCE_DIR
        "/../shared/realdata/rs2_slc_f0w2_hh_20170430/product.xml";
    struct stat info {};
    if (stat(xml.c_str(), &info) != 0)
        GTEST_SKIP() << "the real product is not present";
    const CommandResult json = Footprint(Quoted(xml));
    ASSERT_EQ(json.exitCode, 0) << json.errors;
    const nlohmann::json feature = nlohmann::json::parse(json.output);
    const Grid grid = GridOf(xml);
    ASSERT_EQ(grid.columns, 44u);
    ASSERT_EQ(grid.rows, 31u);
    const auto parts = CheckedParts(feature["geometry"]);
    ASSERT_EQ(parts.size(), 1u);
    EXPECT_EQ(parts[0].size(), 2 * (44 + 31) - 3u);
    ExpectCorners(parts[0], grid);
    EXPECT_EQ(feature["properties"]["product_id"], "PDS_08656720");
    EXPECT_EQ(feature["properties"]["first_line_time"],
              "2017-04-30T08:43:16.790276Z");
}
