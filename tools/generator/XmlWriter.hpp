#pragma once

#include <ostream>
#include <string>
#include <utility>
#include <vector>

namespace rs2gen {

/// Writes an indented XML document element by element, the way the
/// product files lay themselves out: one element per line, tabs for depth.
class XmlWriter {
  public:
    using Attributes = std::vector<std::pair<std::string, std::string>>;

    /// Starts the document with its XML declaration.
    explicit XmlWriter(std::ostream &out);

    /// Opens an element that will hold child elements.
    void Open(const std::string &name, const Attributes &attributes = {});
    /// Closes the innermost open element.
    void Close();
    /// Writes an element holding only text.
    void Element(const std::string &name, const std::string &text,
                 const Attributes &attributes = {});

  private:
    void StartTag(const std::string &name, const Attributes &attributes);

    std::ostream &out;
    std::vector<std::string> openElements;
};

/// Text with the characters that XML reserves replaced by entities.
std::string XmlEscaped(const std::string &text);

/// The texts joined by single spaces, the list notation of the product files.
std::string JoinedBySpaces(const std::vector<std::string> &texts);

/// "%.*e" text of a number, the notation the product files use.
std::string ScientificText(double value, int fractionDigits);

} // namespace rs2gen
