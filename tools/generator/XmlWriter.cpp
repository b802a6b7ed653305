#include "tools/generator/XmlWriter.hpp"

#include <cstdio>

namespace rs2gen {

XmlWriter::XmlWriter(std::ostream &outIn) : out(outIn) {
    out << "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\n";
}

void XmlWriter::StartTag(const std::string &name,
                         const Attributes &attributes) {
    out << std::string(openElements.size(), '\t') << '<' << name;
    for (const auto &[key, value] : attributes)
        out << ' ' << key << "=\"" << XmlEscaped(value) << '"';
    out << '>';
}

void XmlWriter::Open(const std::string &name, const Attributes &attributes) {
    StartTag(name, attributes);
    out << '\n';
    openElements.push_back(name);
}

void XmlWriter::Close() {
    const std::string name = openElements.back();
    openElements.pop_back();
    out << std::string(openElements.size(), '\t') << "</" << name << ">\n";
}

void XmlWriter::Element(const std::string &name, const std::string &text,
                        const Attributes &attributes) {
    StartTag(name, attributes);
    out << XmlEscaped(text) << "</" << name << ">\n";
}

std::string XmlEscaped(const std::string &text) {
    std::string escaped;
    escaped.reserve(text.size());
    for (char c : text) {
        switch (c) {
        case '&':
            escaped += "&amp;";
            break;
        case '<':
            escaped += "&lt;";
            break;
        case '>':
            escaped += "&gt;";
            break;
        case '"':
            escaped += "&quot;";
            break;
        default:
            escaped += c;
        }
    }
    return escaped;
}

std::string JoinedBySpaces(const std::vector<std::string> &texts) {
    std::string joined;
    for (size_t i = 0; i < texts.size(); ++i) {
        if (i > 0)
            joined += ' ';
        joined += texts[i];
    }
    return joined;
}

std::string ScientificText(double value, int fractionDigits) {
    char text[64];
    std::snprintf(text, sizeof text, "%.*e", fractionDigits, value);
    return text;
}

} // namespace rs2gen
