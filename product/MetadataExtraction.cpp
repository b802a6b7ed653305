#include "product/MetadataExtraction.hpp"

#include "host/RasterServices.hpp"
#include "host/TextServices.hpp"
#include "host/XmlUtil.hpp"
#include "model/ZirOdi2CalibImage.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductLoading.hpp"
#include "product/ProductReader.hpp"
#include "product/SideFile.hpp"
#include "product/StringListKeeper.hpp"

#include <algorithm>
#include <charconv>
#include <climits>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <initializer_list>
#include <limits>
#include <optional>
#include <string>
#include <vector>

#include <strings.h>

#include <xercesc/dom/DOMElement.hpp>
#include <xercesc/dom/DOMNode.hpp>

namespace {

using xercesc::DOMDocument;
using xercesc::DOMElement;
using xercesc::DOMNode;

constexpr double kSpeedOfLight = 299792458.0; // metres per second

// Element names of the product description are matched without regard to
// case, except for the few names the steps test exactly.
bool SameName(const std::string &name, const char *other) {
    return strcasecmp(name.c_str(), other) == 0;
}

bool IsOneOf(const std::string &name,
             std::initializer_list<const char *> names) {
    for (const char *candidate : names) {
        if (SameName(name, candidate))
            return true;
    }
    return false;
}

std::string Text(const DOMDocument *document, const char *tag) {
    return ElementTextTranscoded(document, tag).Narrow();
}

// A missing or empty element leaves its key out.
void SetIfPresent(StringListKeeper &list, const std::string &value,
                  const char *key) {
    if (!value.empty())
        list.Set(key, value.c_str());
}

// Visits the child nodes of parent that carry a name and a text. The text
// nodes between elements (named "#text", a name no other node can have) are
// skipped before their name is converted; other node kinds (comments) pass
// under the name the parser gives them.
template <typename Visit>
void ForEachNamedChild(const DOMNode *parent, Visit visit) {
    for (const DOMNode *child = parent->getFirstChild(); child != nullptr;
         child = child->getNextSibling()) {
        if (child->getNodeType() == DOMNode::TEXT_NODE)
            continue;
        std::string name = XmlTranscode(child->getNodeName()).Narrow();
        if (name.empty())
            continue;
        std::string text = NodeText(child);
        if (!text.empty())
            visit(name, text);
    }
}

// Visits every element of tag, in document order.
template <typename Visit>
void ForEachElement(const DOMDocument *document, const char *tag, Visit visit) {
    for (const DOMElement *element : ElementsByTag(document, tag))
        visit(element);
}

enum class ValueForm {
    AsIs,
    ThreeDecimals, // "%.3lf" of the number
    FourDecimals,  // "%.4lf" of the number
    Omit,          // the child is left out
};

enum class NameMatch { IgnoringCase, Exact };

// What a group scan does with the children of one name.
struct ChildRule {
    const char *name;
    const char *key; // null: the child's own name
    ValueForm form;
    NameMatch match;
};

bool RuleApplies(const ChildRule &rule, const std::string &name) {
    return rule.match == NameMatch::Exact ? name == rule.name
                                          : SameName(name, rule.name);
}

std::string FormattedValue(ValueForm form, const std::string &text) {
    switch (form) {
    case ValueForm::ThreeDecimals:
        return MkName("%.3lf", std::atof(text.c_str()));
    case ValueForm::FourDecimals:
        return MkName("%.4lf", std::atof(text.c_str()));
    default:
        return text;
    }
}

// Copies the children of the first element named group into the list, each
// under its own name unless a rule renames, reformats or omits it. Later
// elements of the same name add nothing.
void CollectChildEntries(const DOMDocument *document, const char *group,
                         std::initializer_list<ChildRule> rules,
                         StringListKeeper &list) {
    const DOMNode *first = FirstElementByTag(document, group);
    if (first == nullptr)
        return;
    ForEachNamedChild(
        first, [&](const std::string &name, const std::string &text) {
            std::string key = name;
            ValueForm form = ValueForm::AsIs;
            for (const ChildRule &rule : rules) {
                if (RuleApplies(rule, name)) {
                    key = rule.key != nullptr ? rule.key : name;
                    form = rule.form;
                    break;
                }
            }
            if (form != ValueForm::Omit)
                list.Set(key.c_str(), FormattedValue(form, text).c_str());
        });
}

void CollectRasterAttributes(const DOMDocument *document,
                             StringListKeeper &list) {
    CollectChildEntries(document, "rasterAttributes",
                        {{"numberOfLines", "RowCount", ValueForm::AsIs,
                          NameMatch::IgnoringCase},
                         {"numberOfSamplesPerLine", "ColumnCount",
                          ValueForm::AsIs, NameMatch::IgnoringCase},
                         {"sampledLineSpacing", "SpatialResolutionY",
                          ValueForm::ThreeDecimals, NameMatch::IgnoringCase},
                         {"sampledPixelSpacing", "SpatialResolutionX",
                          ValueForm::ThreeDecimals, NameMatch::IgnoringCase}},
                        list);
}

// The look counts are reported by the metadata lists under keys of their
// own, and the window groups hold nothing a single entry can carry.
void CollectSarProcessing(const DOMDocument *document, StringListKeeper &list) {
    CollectChildEntries(
        document, "sarProcessingInformation",
        {{"azimuthWindow", nullptr, ValueForm::Omit, NameMatch::Exact},
         {"rangeWindow", nullptr, ValueForm::Omit, NameMatch::Exact},
         {"incidenceAngleNearRange", "IncidenceNearAngle", ValueForm::AsIs,
          NameMatch::IgnoringCase},
         {"incidenceAngleFarRange", "IncidenceFarAngle", ValueForm::AsIs,
          NameMatch::IgnoringCase},
         {"slantRangeNearEdge", "SlantRangeNearEdge", ValueForm::FourDecimals,
          NameMatch::IgnoringCase},
         {"numberOfRangeLooks", nullptr, ValueForm::Omit,
          NameMatch::IgnoringCase},
         {"numberOfAzimuthLooks", nullptr, ValueForm::Omit,
          NameMatch::IgnoringCase},
         {"numberOfLinesProcessed", nullptr, ValueForm::Omit,
          NameMatch::IgnoringCase}},
        list);
}

void CollectDopplerCentroid(const DOMDocument *document,
                            StringListKeeper &list) {
    CollectChildEntries(
        document, "dopplerCentroid",
        {{"dopplerCentroidReferenceTime", "DopplerCentroidReferenceTime",
          ValueForm::AsIs, NameMatch::IgnoringCase},
         {"dopplerCentroidCoefficients", "DopplerCentroidCoefficients",
          ValueForm::AsIs, NameMatch::IgnoringCase}},
        list);
}

void CollectEllipsoid(const DOMDocument *document, StringListKeeper &list) {
    CollectChildEntries(
        document, "referenceEllipsoidParameters",
        {{"ellipsoidName", "EllipsoidName", ValueForm::AsIs,
          NameMatch::IgnoringCase},
         {"dopplerCentroidCoefficients", "DopplerCentroidCoefficients",
          ValueForm::AsIs, NameMatch::IgnoringCase},
         {"semiMajorAxis", "SemiMajorAxis", ValueForm::AsIs,
          NameMatch::IgnoringCase},
         {"semiMinorAxis", "SemiMinorAxis", ValueForm::AsIs,
          NameMatch::IgnoringCase},
         {"geodeticTerrainHeight", "NominalLocation_Height", ValueForm::AsIs,
          NameMatch::IgnoringCase}},
        list);
}

// The slant range of the last pixel of a line. An SLC line is sampled in
// slant range already; a ground-range line goes through the product's
// ground-to-slant polynomial. A list shorter than six coefficients is a
// polynomial of lower degree: the missing ones are 0, never values that were
// not parsed. A list without a leading number gives no polynomial and no far
// edge.
void SetSlantRangeFarEdge(const DOMDocument *document, StringListKeeper &list) {
    const char *columns = list.Fetch("ColumnCount");
    const char *spacing = list.Fetch("SpatialResolutionX");
    const char *nearEdge = list.Fetch("SlantRangeNearEdge");
    const char *origin = list.Fetch("groundRangeOrigin");
    if (columns == nullptr || spacing == nullptr || nearEdge == nullptr ||
        origin == nullptr)
        return;
    double lineLength = (std::atof(columns) - 1) * std::atof(spacing);
    double farEdge = 0.0;
    if (ParseProductType(document) == ProductType::SLC) {
        farEdge = lineLength + std::atof(nearEdge);
    } else {
        const char *polynomial = list.Fetch("groundToSlantRangeCoefficients");
        double c[6] = {};
        if (polynomial == nullptr ||
            std::sscanf(polynomial, "%lf %lf %lf %lf %lf %lf", &c[0], &c[1],
                        &c[2], &c[3], &c[4], &c[5]) < 1)
            return;
        double g = lineLength - std::atof(origin);
        farEdge =
            c[0] + g * (c[1] + g * (c[2] + g * (c[3] + g * (c[4] + g * c[5]))));
    }
    list.Set("SlantRangeFarEdge", MkName("%.4lf", farEdge));
}

void SetNumberOfBands(const DOMDocument *document, StringListKeeper &list) {
    std::string polarizations = Text(document, "polarizations");
    if (polarizations.empty())
        return;
    std::size_t pieces = SplitTokens(polarizations, " ").size();
    list.Set("NumberOfBands", MkName("%zu", pieces));
}

void SetWavelength(const DOMDocument *document, StringListKeeper &list) {
    std::string frequencyText = Text(document, "radarCenterFrequency");
    SetIfPresent(list, frequencyText, "RadarCenterFrequency");
    double frequency = std::atof(frequencyText.c_str()); // hertz
    if (frequency != 0.0)
        list.Set("RadarCenterWavelength",
                 MkName("%g", kSpeedOfLight / frequency));
}

void SetProductFormat(const DOMDocument *document, StringListKeeper &list) {
    std::string format = Text(document, "productFormat");
    if (format.empty())
        return;
    list.Set("FormatName", format.c_str());
    list.Set("ProjectionId",
             SameName(format, "GeoTIFF") ? "Geocoded" : "Other");
}

// The host reads the look direction from its own key; the product's name
// for it must not linger as a second, differently named copy.
void SetLookDirection(const DOMDocument *document, StringListKeeper &list) {
    list.Set("LookDirection", Text(document, "antennaPointing").c_str());
    list.Delete("antennaPointing");
}

// atoi of a clock field, but clamped to the int range so that nonsense
// digits cannot overflow.
long long ClockField(const std::string &text) {
    long value = std::strtol(text.c_str(), nullptr, 10);
    if (value > INT_MAX)
        return INT_MAX;
    if (value < INT_MIN)
        return INT_MIN;
    return value;
}

// Seconds since midnight of "YYYY-MM-DDThh:mm:ss.ssssssZ". False when the
// text holds no time of day: shorter than the date and its 'T', or fewer
// than three ':'-separated pieces after them.
bool ParseSecondsOfDay(const std::string &text, double *seconds) {
    constexpr std::size_t kTimeOfDayStart = 11;
    if (text.size() < kTimeOfDayStart)
        return false;
    std::vector<std::string> pieces =
        SplitTokens(text.substr(kTimeOfDayStart), ":");
    if (pieces.size() < 3)
        return false;
    long long minutes = ClockField(pieces[0]) * 60 + ClockField(pieces[1]);
    *seconds = static_cast<double>(minutes * 60) + std::atof(pieces[2].c_str());
    return true;
}

// The text of tag as a time of line, remembered as seconds of day (0 when
// absent).
double SetLineTime(const DOMDocument *document, const char *tag,
                   const char *key, StringListKeeper &list) {
    std::string text = Text(document, tag);
    SetIfPresent(list, text, key);
    return SecondsOfDay(text.c_str());
}

// "hh:mm:ss.ssssssZ" of the middle of two times of day, with the trailing
// zeros of the fraction removed; empty when either time is missing (0).
std::string MidTimeText(double first, double last) {
    if (first == 0.0 || last == 0.0)
        return std::string();
    double mid = (first + last) * 0.5;
    // Hours beyond the int range cannot be a time of day; the formatting
    // below needs them as an int.
    if (!std::isfinite(mid) || std::fabs(mid) / 3600.0 >= INT_MAX)
        return std::string();
    int hours = static_cast<int>(mid / 60 / 60);
    double rest = mid - hours * 3600.0;
    int minutes = static_cast<int>(rest / 60);
    double seconds = rest - minutes * 60.0;
    std::string text = MkName("%02d:%02d:%09.6fZ", hours, minutes, seconds);
    while (text.size() >= 2 && text[text.size() - 2] == '0')
        text.erase(text.size() - 2, 1);
    return text;
}

std::optional<std::string> FetchCopy(const StringListKeeper &list,
                                     const char *key) {
    const char *value = list.Fetch(key);
    if (value == nullptr)
        return std::nullopt;
    return std::string(value);
}

// Distances of the first and last pixel of a line: a line whose pixels run
// from far to near range starts at the far edge.
void SetRangeDistances(StringListKeeper &list) {
    bool lineFlip = false;
    bool pixelFlip = false;
    if (!GetSARFlippingParameters(list.Get(), &lineFlip, &pixelFlip))
        return;
    std::optional<std::string> nearEdge = FetchCopy(list, "SlantRangeNearEdge");
    std::optional<std::string> farEdge = FetchCopy(list, "SlantRangeFarEdge");
    const std::optional<std::string> &first = pixelFlip ? farEdge : nearEdge;
    const std::optional<std::string> &last = pixelFlip ? nearEdge : farEdge;
    if (first)
        list.Set("RangeDistFirstpixel", first->c_str());
    if (last)
        list.Set("RangeDistLastpixel", last->c_str());
}

// Appends printf's "%f" of value and a ';'. to_chars writes the same text
// (both round the exact binary value to six decimals, ties to even, and
// write "inf", "-nan" and the like alike) several times faster than printf,
// which matters for the thousands of numbers of a geolocation grid.
void AppendFixedField(std::string &text, double value) {
    // The longest is -DBL_MAX: 309 digits, a sign, a point and 6 decimals.
    char buffer[320];
    const std::to_chars_result result = std::to_chars(
        buffer, buffer + sizeof buffer, value, std::chars_format::fixed, 6);
    text.append(buffer, result.ptr);
    text += ';';
}

// The geolocation grid, one entry per imageCoordinate element.
struct TiePoints {
    explicit TiePoints(std::size_t count)
        : pixel(count), line(count), latitude(count), longitude(count),
          height(count) {}
    std::vector<double> pixel;
    std::vector<double> line;
    std::vector<double> latitude;
    std::vector<double> longitude;
    std::vector<double> height;
};

struct CoordinateField {
    const char *name;
    std::vector<double> *values;
};

// Reads the named numeric children of the first count elements of tag into
// the fields, stopping early when the document has fewer elements.
void ReadTieCoordinates(const DOMDocument *document, const char *tag,
                        std::size_t count,
                        std::initializer_list<CoordinateField> fields) {
    const std::vector<const DOMElement *> elements =
        ElementsByTag(document, tag);
    const std::size_t present = std::min(count, elements.size());
    for (std::size_t i = 0; i < present; ++i) {
        ForEachNamedChild(
            elements[i], [&](const std::string &name, const std::string &text) {
                for (const CoordinateField &field : fields) {
                    if (SameName(name, field.name))
                        (*field.values)[i] = std::atof(text.c_str());
                }
            });
    }
}

void ExtractGeolocationGrid(const DOMDocument *document,
                            ZirOdi2CalibImage *model, StringListKeeper &list) {
    std::size_t count = CountElementsByTag(document, "imageCoordinate");
    // The model counts tie points in 32 bits; a grid beyond that is cut.
    if (count > static_cast<std::size_t>(std::numeric_limits<int32_t>::max()))
        count = static_cast<std::size_t>(std::numeric_limits<int32_t>::max());
    TiePoints points(count);
    ReadTieCoordinates(document, "imageCoordinate", count,
                       {{"line", &points.line}, {"pixel", &points.pixel}});
    ReadTieCoordinates(document, "geodeticCoordinate", count,
                       {{"latitude", &points.latitude},
                        {"longitude", &points.longitude},
                        {"height", &points.height}});
    std::string grid;
    for (std::size_t i = 0; i < count; ++i) {
        for (double value : {points.latitude[i], points.longitude[i],
                             points.height[i], points.line[i], points.pixel[i]})
            AppendFixedField(grid, value);
    }
    list.Set("GeolocationGrid", grid.c_str());

    model->SetTiePointCount(static_cast<int32_t>(count));
    model->SetTieLines(points.line.data());
    model->SetTiePixels(points.pixel.data());
    model->SetTieLatitudes(points.latitude.data());
    model->SetTieLongitudes(points.longitude.data());
    model->SetTieHeights(points.height.data());
}

// Seven fields per state vector, each followed by ';', times as written.
std::string StateVectorsText(const DOMDocument *document) {
    std::string text;
    ForEachElement(document, "stateVector", [&](const DOMNode *vector) {
        ForEachNamedChild(
            vector, [&](const std::string &name, const std::string &value) {
                if (IsOneOf(name,
                            {"timeStamp", "xPosition", "yPosition", "zPosition",
                             "xVelocity", "yVelocity", "zVelocity"}))
                    text += value + ";";
            });
    });
    return text;
}

// Four fields per attitude sample: seconds of day, yaw, roll, pitch. A
// sample whose time stamp holds no time of day is left out whole, so that
// every later sample keeps its fields in their places.
std::string AttitudesText(const DOMDocument *document) {
    std::string text;
    ForEachElement(document, "attitudeAngles", [&](const DOMNode *sample) {
        std::string fields;
        bool usable = true;
        ForEachNamedChild(
            sample, [&](const std::string &name, const std::string &value) {
                double seconds = 0.0;
                if (SameName(name, "timeStamp")) {
                    if (ParseSecondsOfDay(value, &seconds))
                        AppendFixedField(fields, seconds);
                    else
                        usable = false;
                } else if (IsOneOf(name, {"yaw", "roll", "pitch"})) {
                    fields += value + ";";
                }
            });
        if (usable)
            text += fields;
    });
    return text;
}

void AppendSideFile(const ProductReader &reader, StringListKeeper &list) {
    StringListKeeper sideFile(ReadSideFile(reader));
    if (sideFile.Get() != nullptr)
        list.Append(sideFile.Get());
}

void SetSourceEntries(const DOMDocument *document, StringListKeeper &list) {
    SetIfPresent(list, Text(document, "beamModeMnemonic"), "BeamMode");
    SetIfPresent(list, Text(document, "productId"), "productId");
    list.Set("PlatformName", "RADARSAT-2");
    SetIfPresent(list, Text(document, "acquisitionType"), "Acquisition_Type");
    SetIfPresent(list, Text(document, "antennaPointing"), "antennaPointing");
    SetIfPresent(list, Text(document, "productId"), "SourceID");
}

// The date part ("YYYY-MM-DD") of the raw data start time.
std::string AcquisitionDate(const DOMDocument *document) {
    constexpr std::size_t kDateLength = 10;
    return Text(document, "rawDataStartTime").substr(0, kDateLength);
}

} // namespace

double SecondsOfDay(const char *text) {
    double seconds = 0.0;
    if (text == nullptr || !ParseSecondsOfDay(text, &seconds))
        return 0.0;
    return seconds;
}

void ExtractProductMetadata(ProductReader &reader,
                            const xercesc::DOMDocument *document,
                            ZirOdi2CalibImage *model) {
    if (document == nullptr || model == nullptr)
        return;
    // Later steps read earlier entries back, and a later entry of a key
    // replaces an earlier one, so the order below is part of the result.
    StringListKeeper list;
    SetSourceEntries(document, list);
    CollectRasterAttributes(document, list);
    CollectSarProcessing(document, list);
    CollectChildEntries(document, "slantRangeToGroundRange", {}, list);
    SetSlantRangeFarEdge(document, list);
    CollectDopplerCentroid(document, list);
    CollectEllipsoid(document, list);
    SetNumberOfBands(document, list);
    SetWavelength(document, list);
    SetIfPresent(list, Text(document, "pulseRepetitionFrequency"),
                 "PulseRepetitionFrequency");
    SetIfPresent(list, Text(document, "passDirection"), "OrbitDirection");
    SetProductFormat(document, list);
    SetLookDirection(document, list);
    std::string date = AcquisitionDate(document);
    SetIfPresent(list, Text(document, "passDirection"), "passDirection");
    double firstLine = SetLineTime(document, "zeroDopplerTimeFirstLine",
                                   "TimeOfFirstLine", list);
    double lastLine = SetLineTime(document, "zeroDopplerTimeLastLine",
                                  "TimeOfLastLine", list);
    std::string midTime = MidTimeText(firstLine, lastLine);
    SetRangeDistances(list);
    SetIfPresent(list, Text(document, "satelliteHeight"), "SatelliteAltitude");
    if (!date.empty() && !midTime.empty())
        list.Set("Acquisition_DateTime", (date + "T" + midTime).c_str());
    ExtractGeolocationGrid(document, model, list);
    list.Set("SatPositions", StateVectorsText(document).c_str());
    list.Set("SatAttitudes", AttitudesText(document).c_str());
    AppendSideFile(reader, list);
    model->SetMetadata(list.Get());
}
