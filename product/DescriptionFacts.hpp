#pragma once

#include <optional>
#include <string>
#include <vector>

#include <xercesc/dom/DOMDocument.hpp>

/// What the listing operations read from a product description: the text
/// of each image element, once per attribute it carries (as the image file
/// list has it), and the calibration types it offers, in list order.
struct DescriptionFacts {
    std::vector<std::string> imageEntries;
    std::vector<std::string> calibrationTypes;
};

/// The facts of a parsed description.
DescriptionFacts FactsOfDescription(const xercesc::DOMDocument *document);

/// Keeps the facts of the description at path, parsed when a dataset was
/// opened, so that listing the files or the calibration types of an open
/// product does not parse its description again. A few recent descriptions
/// are kept.
void RememberDescriptionFacts(const char *path, DescriptionFacts facts);

/// The kept facts of the description at path, while the file is the one
/// that was parsed: the same file (device and inode), size and
/// modification time. Nothing when none is kept or the file changed.
std::optional<DescriptionFacts> RecalledDescriptionFacts(const char *path);
