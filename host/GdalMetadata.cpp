#include "host/GdalMetadata.hpp"

namespace host {
namespace {

// Item names and values are free text: the XML markup characters in them
// become entities so that any text reads back as written.
std::string Escaped(const std::string &text) {
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        switch (c) {
        case '&':
            out += "&amp;";
            break;
        case '<':
            out += "&lt;";
            break;
        case '>':
            out += "&gt;";
            break;
        case '"':
            out += "&quot;";
            break;
        default:
            out += c;
        }
    }
    return out;
}

void AppendItem(std::string &xml, const std::string &name,
                const std::string &value, const std::string &attributes) {
    xml += "  <Item name=\"" + Escaped(name) + "\"" + attributes + ">" +
           Escaped(value) + "</Item>\n";
}

} // namespace

std::string GdalMetadataXml(const GeoTiffDescription &description) {
    std::string items;
    for (const auto &[name, value] : description.items)
        AppendItem(items, name, value, "");
    for (size_t band = 0; band < description.bands.size(); ++band) {
        const GeoTiffDescription::Band &b = description.bands[band];
        const std::string sample = " sample=\"" + std::to_string(band) + "\"";
        if (!b.description.empty())
            AppendItem(items, "DESCRIPTION", b.description,
                       sample + " role=\"description\"");
        for (const auto &[name, value] : b.items)
            AppendItem(items, name, value, sample);
    }
    return items.empty() ? std::string()
                         : "<GDALMetadata>\n" + items + "</GDALMetadata>\n";
}

} // namespace host
