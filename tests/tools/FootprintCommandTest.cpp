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
#include <xercesc/util/XMLString.hpp>

#include <algorithm>
#include <cstdlib>
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

struct Point {
    double longitude, latitude;
};

// An XML text parsed whole; malformed XML throws from the constructor.
class XmlDocument {
  public:
    explicit XmlDocument(const std::string &xml) {
        parser.setErrorHandler(&throwOnFatalError);
        const xercesc::MemBufInputSource source(
            reinterpret_cast<const XMLByte *>(xml.data()), xml.size(), "xml");
        parser.parse(source);
    }
    const xercesc::DOMNodeList *Elements(const char *tag) const {
        const std::unique_ptr<XMLCh, void (*)(XMLCh *)> wide(
            xercesc::XMLString::transcode(tag),
            [](XMLCh *p) { xercesc::XMLString::release(&p); });
        return parser.getDocument()->getElementsByTagName(wide.get());
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

// The text of the first element named tag in or below node.
std::string Text(const xercesc::DOMNode *node, const char *tag) {
    const std::unique_ptr<XMLCh, void (*)(XMLCh *)> wide(
        xercesc::XMLString::transcode(tag),
        [](XMLCh *p) { xercesc::XMLString::release(&p); });
    const xercesc::DOMNodeList *nodes =
        static_cast<const xercesc::DOMElement *>(node)->getElementsByTagName(
            wide.get());
    if (nodes->getLength() == 0)
        return "";
    const std::unique_ptr<char, void (*)(char *)> narrow(
        xercesc::XMLString::transcode(nodes->item(0)->getTextContent()),
        [](char *p) { xercesc::XMLString::release(&p); });
    return narrow.get();
}

double Number(const xercesc::DOMNode *node, const char *tag) {
    return std::strtod(Text(node, tag).c_str(), nullptr);
}

// The grid of product.xml: its four corner tie points (top left, top
// right, bottom right, bottom left) and its size in tie points.
struct Grid {
    std::vector<Point> corners;
    size_t columns = 0, rows = 0;
};

Grid GridOf(const std::string &productXml) {
    const XmlDocument document(rs2test::FileText(productXml));
    const xercesc::DOMNodeList *ties = document.Elements("imageTiePoint");
    struct Tie {
        double line, pixel;
        Point ground;
    };
    std::vector<Tie> all;
    for (XMLSize_t i = 0; i < ties->getLength(); ++i)
        all.push_back({Number(ties->item(i), "line"),
                       Number(ties->item(i), "pixel"),
                       {Number(ties->item(i), "longitude"),
                        Number(ties->item(i), "latitude")}});
    if (all.empty())
        return {};
    const auto [top, bottom] = std::minmax_element(
        all.begin(), all.end(),
        [](const Tie &a, const Tie &b) { return a.line < b.line; });
    const auto [left, right] = std::minmax_element(
        all.begin(), all.end(),
        [](const Tie &a, const Tie &b) { return a.pixel < b.pixel; });
    const double corners[4][2] = {{top->line, left->pixel},
                                  {top->line, right->pixel},
                                  {bottom->line, right->pixel},
                                  {bottom->line, left->pixel}};
    Grid grid;
    for (const auto &corner : corners)
        for (const Tie &tie : all)
            if (tie.line == corner[0] && tie.pixel == corner[1])
                grid.corners.push_back(tie.ground);
    const double topLine = top->line;
    grid.columns = static_cast<size_t>(
        std::count_if(all.begin(), all.end(),
                      [&](const Tie &t) { return t.line == topLine; }));
    grid.rows = all.size() / std::max<size_t>(grid.columns, 1);
    return grid;
}

std::vector<Point> GeoJsonRing(const nlohmann::json &feature) {
    std::vector<Point> ring;
    for (const nlohmann::json &pair : feature["geometry"]["coordinates"][0])
        ring.push_back({pair[0].get<double>(), pair[1].get<double>()});
    return ring;
}

// Twice the enclosed area, positive for a counter-clockwise ring.
double SignedDoubleArea(const std::vector<Point> &ring) {
    double area = 0.0;
    for (size_t i = 1; i < ring.size(); ++i)
        area += (ring[i - 1].longitude - ring[i].longitude) *
                (ring[i - 1].latitude + ring[i].latitude);
    return area;
}

// Checks the ring is closed, counter-clockwise and passes through the grid's
// corners where a walk around the grid's border meets them.
void ExpectBorderOfGrid(std::vector<Point> ring, const Grid &grid) {
    ASSERT_EQ(grid.corners.size(), 4u);
    ASSERT_EQ(ring.size(), 2 * (grid.columns + grid.rows) - 3);
    EXPECT_DOUBLE_EQ(ring.front().longitude, ring.back().longitude);
    EXPECT_DOUBLE_EQ(ring.front().latitude, ring.back().latitude);
    EXPECT_GT(SignedDoubleArea(ring), 0.0);
    // The walk in image order may have been turned round to run
    // counter-clockwise; turned back, it meets the corners in grid order.
    if (std::abs(ring[grid.columns - 1].longitude - grid.corners[1].longitude) >
        1e-6)
        std::reverse(ring.begin(), ring.end());
    const size_t at[] = {0, grid.columns - 1, grid.columns + grid.rows - 2,
                         2 * grid.columns + grid.rows - 3};
    for (size_t k = 0; k < 4; ++k) {
        EXPECT_NEAR(ring[at[k]].longitude, grid.corners[k].longitude, 1e-6)
            << "corner " << k;
        EXPECT_NEAR(ring[at[k]].latitude, grid.corners[k].latitude, 1e-6)
            << "corner " << k;
    }
}

std::vector<Point> KmlRing(const XmlDocument &kml) {
    std::istringstream text(
        Text(kml.Elements("LinearRing")->item(0), "coordinates"));
    std::vector<Point> ring;
    std::string tuple;
    while (text >> tuple) {
        Point point{};
        double height = -1.0;
        EXPECT_EQ(std::sscanf(tuple.c_str(), "%lf,%lf,%lf", &point.longitude,
                              &point.latitude, &height),
                  3)
            << tuple;
        EXPECT_EQ(height, 0.0);
        ring.push_back(point);
    }
    return ring;
}

} // namespace

TEST(FootprintCommand, outlines_the_grid_border_in_geojson_and_kml) {
    // Pixel 0 at far range mirrors the scene, so that one of the two walks
    // in image order runs clockwise on the ground.
    for (const bool pixelTimeDecreasing : {false, true}) {
        SCOPED_TRACE(pixelTimeDecreasing ? "far range first" : "near first");
        rs2test::TempDir folder;
        rs2gen::ProductOptions options;
        options.width = 24;
        options.height = 16;
        options.tieGridColumns = 5;
        options.tieGridRows = 4;
        options.pixelTimeDecreasing = pixelTimeDecreasing;
        const std::string xml =
            rs2gen::GenerateProduct(folder.Path(), options).productXml;
        const Grid grid = GridOf(xml);

        const CommandResult json = Footprint(Quoted(folder.Path()));
        ASSERT_EQ(json.exitCode, 0) << json.errors;
        const nlohmann::json feature = nlohmann::json::parse(json.output);
        EXPECT_EQ(feature["type"], "Feature");
        EXPECT_EQ(feature["geometry"]["type"], "Polygon");
        const nlohmann::json &properties = feature["properties"];
        EXPECT_EQ(properties["product_id"], "PDS_00000001");
        EXPECT_EQ(properties["product_type"], "SGF");
        const XmlDocument product(rs2test::FileText(xml));
        const std::string firstLine =
            Text(product.Elements("sarProcessingInformation")->item(0),
                 "zeroDopplerTimeFirstLine");
        EXPECT_EQ(properties["first_line_time"], firstLine);
        const std::vector<Point> ring = GeoJsonRing(feature);
        ExpectBorderOfGrid(ring, grid);

        const CommandResult kml = Footprint(Quoted(xml) + " --format kml");
        ASSERT_EQ(kml.exitCode, 0) << kml.errors;
        const XmlDocument placemark(kml.output);
        EXPECT_EQ(Text(placemark.Elements("Placemark")->item(0), "name"),
                  "PDS_00000001");
        EXPECT_EQ(Text(placemark.Elements("TimeStamp")->item(0), "when"),
                  firstLine);
        const std::vector<Point> kmlRing = KmlRing(placemark);
        ASSERT_EQ(kmlRing.size(), ring.size());
        for (size_t i = 0; i < ring.size(); ++i) {
            EXPECT_DOUBLE_EQ(kmlRing[i].longitude, ring[i].longitude);
            EXPECT_DOUBLE_EQ(kmlRing[i].latitude, ring[i].latitude);
        }
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

TEST(FootprintCommand, cuts_an_outline_across_the_antimeridian_in_two) {
    rs2test::TempDir folder;
    rs2gen::ProductOptions options;
    options.centerLongitude = 180.0; // tie points on both sides of it
    const std::string xml =
        rs2gen::GenerateProduct(folder.Path(), options).productXml;
    const CommandResult json = Footprint(Quoted(xml));
    ASSERT_EQ(json.exitCode, 0) << json.errors;
    const nlohmann::json geometry =
        nlohmann::json::parse(json.output)["geometry"];
    EXPECT_EQ(geometry["type"], "MultiPolygon");
    ASSERT_EQ(geometry["coordinates"].size(), 2u);
    std::vector<Point> points;
    for (const nlohmann::json &polygon : geometry["coordinates"]) {
        const std::vector<Point> part =
            GeoJsonRing({{"geometry", {{"coordinates", polygon}}}});
        EXPECT_GT(SignedDoubleArea(part), 0.0);
        EXPECT_DOUBLE_EQ(part.front().longitude, part.back().longitude);
        EXPECT_DOUBLE_EQ(part.front().latitude, part.back().latitude);
        points.insert(points.end(), part.begin(), part.end());
    }
    const auto [west, east] = std::minmax_element(
        points.begin(), points.end(), [](const Point &a, const Point &b) {
            return a.longitude < b.longitude;
        });
    EXPECT_EQ(west->longitude, -180.0);
    EXPECT_EQ(east->longitude, 180.0);
    // The corners as the outline gives them: east of the antimeridian
    // counted from -180, to the six decimals of the driver's grid.
    for (Point corner : GridOf(xml).corners) {
        if (corner.longitude > 180.0)
            corner.longitude -= 360.0;
        const auto atCorner = [&](const Point &p) {
            return std::abs(p.longitude - corner.longitude) < 1e-6 &&
                   std::abs(p.latitude - corner.latitude) < 1e-6;
        };
        EXPECT_TRUE(std::any_of(points.begin(), points.end(), atCorner))
            << corner.longitude << " " << corner.latitude;
    }
    const CommandResult kml = Footprint(Quoted(xml) + " --format kml");
    ASSERT_EQ(kml.exitCode, 0) << kml.errors;
    EXPECT_EQ(XmlDocument(kml.output).Elements("Polygon")->getLength(), 2u);
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
    const XmlDocument placemark(kml.output);
    EXPECT_EQ(Text(placemark.Elements("Placemark")->item(0), "name"),
              "PDS_\u00E9<&>\"");
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
    EXPECT_EQ(grid.columns, 44u);
    EXPECT_EQ(grid.rows, 31u);
    ExpectBorderOfGrid(GeoJsonRing(feature), grid);
    EXPECT_EQ(feature["properties"]["product_id"], "PDS_08656720");
    EXPECT_EQ(feature["properties"]["first_line_time"],
              "2017-04-30T08:43:16.790276Z");
}
