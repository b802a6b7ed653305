// rs2 footprint: the scene outline that catalogues and batch jobs index
// products by, as a GeoJSON Feature or a KML Placemark on standard output.
// The outline is the border of the geolocation grid (SceneOutline), with the
// product's identity and time as properties.

#include "tools/generator/XmlWriter.hpp"
#include "tools/rs2/Commands.hpp"
#include "tools/rs2/DatasetChoice.hpp"
#include "tools/rs2/JsonText.hpp"
#include "tools/rs2/SceneOutline.hpp"

#include "host/Raster.hpp"

#include <nlohmann/json.hpp>

#include <charconv>
#include <cstdio>
#include <regex>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace {

struct FootprintOptions {
    std::string name;
    std::string format = "geojson";
};

// The properties of the outline, name and value, in output order; an empty
// value is one the product does not give.
using Properties = std::vector<std::pair<std::string, std::string>>;

// A time the product gives in UTC, as ISO 8601 with its zone written out;
// empty when the text is not such a time.
std::string IsoUtcTime(const std::string &text) {
    static const std::regex time(
        R"(\d{4}-\d{2}-\d{2}T\d{2}:\d{2}:\d{2}(\.\d+)?Z?)");
    if (!std::regex_match(text, time))
        return "";
    return text.back() == 'Z' ? text : text + "Z";
}

Properties OutlineProperties(const host::Raster &raster) {
    const auto value = [&](const char *key) {
        return MetadataValue(raster, key);
    };
    return {{"product_id", value("productId")},
            {"first_line_time", IsoUtcTime(value("TimeOfFirstLine"))},
            {"last_line_time", IsoUtcTime(value("TimeOfLastLine"))},
            {"product_type", value("ProductType")},
            {"beam_mode", value("BeamMode")},
            {"polarizations", value("Polarizations")},
            {"pass_direction", value("OrbitDirection")}};
}

// The outline in one part, or two for a scene across the antimeridian.
using Outline = std::vector<std::vector<GroundPoint>>;

Outline DatasetOutline(const host::Raster &raster) {
    const std::string grid = MetadataValue(raster, "GeolocationGrid");
    if (grid.empty())
        throw std::runtime_error(
            "the dataset has no geolocation grid to outline");
    return OutlineParts(OuterRing(ParseGeolocationGrid(grid)));
}

nlohmann::json GeoJsonGeometry(const Outline &outline) {
    nlohmann::json polygons = nlohmann::json::array();
    for (const std::vector<GroundPoint> &ring : outline) {
        nlohmann::json coordinates = nlohmann::json::array();
        for (const GroundPoint &point : ring)
            coordinates.push_back({point.longitude, point.latitude});
        polygons.push_back(nlohmann::json::array({coordinates}));
    }
    if (polygons.size() == 1)
        return {{"type", "Polygon"}, {"coordinates", polygons[0]}};
    return {{"type", "MultiPolygon"}, {"coordinates", polygons}};
}

std::string GeoJsonText(const Outline &outline, const Properties &properties) {
    nlohmann::json members = nlohmann::json::object();
    for (const auto &[key, value] : properties)
        members[key] = value.empty() ? nlohmann::json() : nlohmann::json(value);
    const nlohmann::json feature = {{"type", "Feature"},
                                    {"geometry", GeoJsonGeometry(outline)},
                                    {"properties", members}};
    return JsonText(feature, 2);
}

// Text made fit for XML character data and attribute values: valid UTF-8,
// markup characters escaped, and the control characters XML 1.0 cannot
// hold in any form replaced by U+FFFD.
std::string XmlText(const std::string &text) {
    std::string fit;
    for (const char c : ValidUtf8(text)) {
        const bool forbidden = static_cast<unsigned char>(c) < 0x20 &&
                               c != '\t' && c != '\n' && c != '\r';
        fit += forbidden ? "\xEF\xBF\xBD" : std::string(1, c);
    }
    return rs2gen::XmlEscaped(fit);
}

// The shortest text that reads back as the same double.
std::string NumberText(double value) {
    char buffer[32];
    const std::to_chars_result result =
        std::to_chars(buffer, buffer + sizeof buffer, value);
    return std::string(buffer, result.ptr);
}

std::string KmlPolygon(const std::vector<GroundPoint> &ring,
                       const std::string &indent) {
    std::string kml = indent + "<Polygon><outerBoundaryIs><LinearRing>\n" +
                      indent + "  <coordinates>";
    for (size_t i = 0; i < ring.size(); ++i)
        kml += (i == 0 ? "" : " ") + NumberText(ring[i].longitude) + "," +
               NumberText(ring[i].latitude) + ",0";
    return kml + "</coordinates>\n" + indent +
           "</LinearRing></outerBoundaryIs></Polygon>\n";
}

std::string KmlText(const Outline &outline, const Properties &properties) {
    std::string kml = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
                      "<kml xmlns=\"http://www.opengis.net/kml/2.2\">\n"
                      "  <Placemark>\n";
    // KML wants the name before the time stamp, and the properties list
    // the id before the time.
    std::string data;
    for (const auto &[key, value] : properties) {
        if (value.empty())
            continue;
        if (key == "product_id")
            kml += "    <name>" + XmlText(value) + "</name>\n";
        else if (key == "first_line_time")
            kml += "    <TimeStamp><when>" + value + "</when></TimeStamp>\n";
        data += "      <Data name=\"" + key + "\"><value>" + XmlText(value) +
                "</value></Data>\n";
    }
    kml += "    <ExtendedData>\n" + data + "    </ExtendedData>\n";
    if (outline.size() == 1) {
        kml += KmlPolygon(outline[0], "    ");
    } else {
        kml += "    <MultiGeometry>\n";
        for (const std::vector<GroundPoint> &ring : outline)
            kml += KmlPolygon(ring, "      ");
        kml += "    </MultiGeometry>\n";
    }
    return kml + "  </Placemark>\n</kml>\n";
}

} // namespace

void AddFootprintCommand(CLI::App &app) {
    static FootprintOptions options;
    CLI::App *command = app.add_subcommand(
        "footprint", "Print the scene outline as GeoJSON or KML");
    command->add_option("NAME", options.name, "dataset name")->required();
    command
        ->add_option("--format", options.format,
                     "geojson (default): a Feature; kml: a Placemark "
                     "(either case)")
        // transform, unlike check, also sets the value to the member's own
        // text, so that "KML" chooses kml.
        ->transform(CLI::IsMember({"geojson", "kml"}, CLI::ignore_case));
    command->footer(
        "The outline is the border of the product's geolocation grid, in "
        "WGS 84 longitude and latitude, counter-clockwise and closed, cut in "
        "two at the antimeridian; its properties name the product and its "
        "first line time (UTC).\n"
        "Examples:\n  rs2 footprint dir > scene.geojson\n  rs2 footprint "
        "dir/product.xml --format kml > scene.kml");
    command->callback([] {
        host::Raster raster = OpenDataset(options.name);
        const Outline outline = DatasetOutline(raster);
        const Properties properties = OutlineProperties(raster);
        const std::string text = options.format == "kml"
                                     ? KmlText(outline, properties)
                                     : GeoJsonText(outline, properties) + "\n";
        std::fputs(text.c_str(), stdout);
    });
}
