// The calibration look-up tables of a product: product.xml names one file per
// calibration kind in its lookupTable elements (the kind in an attribute, the
// file name as text); each file holds an offset and one gain per range
// column.

#include "product/CalibrationTables.hpp"

#include "host/HostMemory.hpp"
#include "model/ProductFolder.hpp"
#include "product/BoundedFileRead.hpp"
#include "product/DescriptionFacts.hpp"

#include "host/ErrorReports.hpp"
#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "model/LookupTable.hpp"
#include "model/ZirOdi2CalibImage.hpp"
#include "product/DocumentAccess.hpp"
#include "product/FloatText.hpp"
#include "product/ProductFileNames.hpp"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <new>
#include <string>
#include <string_view>
#include <strings.h>
#include <vector>

#include <xercesc/dom/DOMException.hpp>
#include <xercesc/dom/DOMNamedNodeMap.hpp>
#include <xercesc/dom/DOMNode.hpp>
#include <xercesc/sax/SAXException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

namespace {

using host::HostText;

constexpr char kLookupTableTag[] = "lookupTable";
constexpr char kDefaultKind[] = "Sigma Nought";
constexpr char kNoCalibration[] = "None";
constexpr char kCalibrationTypePrefix[] = ":Calibration Type:";
constexpr double kDegreesPerRadian = 57.29577951308232;

constexpr char kNoLookupTableName[] =
    "The LUT file name can not be found in product.xml file.\n"
    "The image will be loaded without calibration";
constexpr char kLookupTableMissing[] =
    "The specified LUT file %s can not be found in the directory.\n"
    "The image will be loaded without calibration";
constexpr char kLookupTableUnreadable[] =
    "The LUT file %s can not be read.\n"
    "The image will be loaded without calibration";
constexpr char kLookupTableTooLarge[] =
    "The LUT file %s holds more than %s, far more than a table of one gain "
    "per column needs; it is not read";
constexpr char kLookupTableTooShort[] =
    "The LUT file %s has %zu gains for %lld columns.\n"
    "The image will be loaded without calibration";

// The largest table file read. A real one holds about 200 KB for 18,000
// columns; the limit leaves room for tables of a few million gains while the
// parse of the largest accepted file stays well under a GiB.
constexpr std::size_t kMaxLookupTableBytes = 64u << 20;

// The path of the table file whose lookupTable attribute contains pattern,
// joined to the product directory (which ends in its separator), as a host
// string the caller frees; null when none matches or when files refuses its
// name. matchedValue receives the attribute as written.
char *LookupTablePath(const xercesc::DOMDocument *document,
                      const ZirOdi2CalibImage *model, const char *pattern,
                      std::string *matchedValue, LookupTableFiles &files) {
    if (document == nullptr || model == nullptr || pattern == nullptr)
        return nullptr;
    HostText fileName(FindTextByAttribute(document, kLookupTableTag,
                                          AttributeMatch::ContainsIgnoringCase,
                                          pattern, matchedValue));
    if (!fileName ||
        !files.Admits(model->GetProductDirectory(), fileName.get()))
        return nullptr;
    // Without a product directory the file name is taken as it stands.
    const char *directory = model->GetProductDirectory();
    std::string path = directory != nullptr ? directory : "";
    path += fileName.get();
    return HString(path.c_str());
}

// The gains text holds one number per column separated by single spaces.
// Every token gives one entry, the empty ones between two spaces included
// (the tokens of SplitTokens(text, " "), walked in place rather than copied,
// as a table holds many thousand); tokens that hold no number are skipped,
// so the parsed numbers are packed from entry 0 and the entries left over
// after the last one stay 0.0.
void ParseGains(std::string_view text, LookupTable &table) {
    table.Resize(
        static_cast<std::size_t>(std::count(text.begin(), text.end(), ' ')) +
        1);
    std::size_t k = 0;
    std::size_t start = 0;
    for (;;) {
        const std::size_t space = text.find(' ', start);
        float value = 0.0f;
        if (ReadFloatLikeStream(text.substr(start, space - start), &value))
            table.Set(k++, value);
        if (space == std::string_view::npos)
            return;
        start = space + 1;
    }
}

// Runs work over a parse; a file the parser or the allocator gives up on
// yields the same neutral result as a file without a document.
template <typename Result, typename Work> Result UnlessParseFails(Work work) {
    try {
        return work();
    } catch (const xercesc::SAXException &) {
    } catch (const xercesc::XMLException &) {
    } catch (const xercesc::DOMException &) {
    } catch (const xercesc::OutOfMemoryException &) {
    } catch (const std::bad_alloc &) {
    }
    return Result();
}

// Whether a parsed table file can be taken as a table. The parser runs
// without an error handler, so a file that is not well-formed still yields a
// document: an empty one when nothing could be read, or the elements read
// before the fault. Its error count tells nothing either, as validation
// without a grammar counts an error for every element of a sound file. So a
// file counts as read when its document has a root element and a gains
// element; without them it would give one gain of 0.0 and be applied as
// calibration.
bool IsLookupTableDocument(const xercesc::DOMDocument *document) {
    return document != nullptr && document->getDocumentElement() != nullptr &&
           CountElementsByTag(document, "gains") != 0;
}

// Reads a table file while the product description's parse holds the XML
// platform; null when the file gives no table document.
std::unique_ptr<LookupTable> ParseLookupTableFile(const char *path) {
    const FileBytes file = ReadFileUpTo(path, kMaxLookupTableBytes);
    if (file.status == FileReadStatus::TooLarge)
        IMPError(-1, host::kWarning, "%s",
                 MkName(_(kLookupTableTooLarge), path,
                        SizeText(kMaxLookupTableBytes).c_str()));
    if (file.status != FileReadStatus::Read)
        return nullptr;
    DocumentParse parse(file.bytes, path,
                        DocumentParse::Platform::AlreadyInitialized);
    const xercesc::DOMDocument *document = parse.Document();
    if (!IsLookupTableDocument(document))
        return nullptr;
    // The texts of the first offset and gains elements, "" without them.
    const std::string offsetText =
        NodeText(FirstElementByTag(document, "offset"));
    const std::string gainsText =
        NodeText(FirstElementByTag(document, "gains"));
    auto table = std::make_unique<LookupTable>();
    table->SetOffset(static_cast<float>(std::atof(offsetText.c_str())));
    ParseGains(gainsText, *table);
    return table;
}

void WarnWithoutCalibration(ZirOdi2CalibImage *model, const char *message) {
    IMPError(-1, host::kWarning, "%s", message);
    model->SetCalibrationType(kNoCalibration);
}

// The number of columns a calibration table must cover: the width of the
// model's first image, or, when no image opens, the width product.xml
// declares; 0 when neither is known.
long long ImageColumns(const xercesc::DOMDocument *document,
                       ZirOdi2CalibImage &model) {
    if (const int32_t width = model.Width(); width > 0)
        return width;
    const std::string declared =
        NodeText(FirstElementByTag(document, "numberOfSamplesPerLine"));
    char *end = nullptr;
    const long long columns = std::strtoll(declared.c_str(), &end, 10);
    return end != declared.c_str() && columns > 0 ? columns : 0;
}

float IncidenceDegrees(float beta, float sigma, IncidenceFormula formula) {
    const float ratio = beta / sigma;
    // SLC gains divide amplitudes, so their ratio is the square root of the
    // ratio of power gains that detected products carry.
    const float sine =
        formula == IncidenceFormula::Complex ? powf(ratio, 2.0f) : ratio;
    return static_cast<float>(static_cast<double>(asinf(sine)) *
                              kDegreesPerRadian);
}

bool IsSigmaNought(const std::string &value) {
    return strcasecmp(value.c_str(), kDefaultKind) == 0;
}

std::vector<std::string>
LookupTableAttributes(const xercesc::DOMDocument *document) {
    std::vector<std::string> values;
    for (const xercesc::DOMElement *element :
         ElementsByTag(document, kLookupTableTag)) {
        const xercesc::DOMNamedNodeMap *attributes = element->getAttributes();
        const XMLSize_t attributeCount =
            attributes != nullptr ? attributes->getLength() : 0;
        for (XMLSize_t a = 0; a < attributeCount; ++a)
            values.push_back(
                XmlTranscode(attributes->item(a)->getNodeValue()).Narrow());
    }
    return values;
}

// The list of calibration types, each entry ":Calibration Type:" + kind,
// handed to the host in one call: adding entries one by one would search
// and grow the whole list for each of a product's many lookupTable
// elements.
char **CalibrationTypeList(const std::vector<std::string> &kinds) {
    std::vector<std::string> entries;
    entries.reserve(kinds.size());
    for (const std::string &kind : kinds)
        entries.push_back(kCalibrationTypePrefix + kind);
    std::vector<char *> texts;
    texts.reserve(entries.size() + 1);
    for (std::string &entry : entries)
        texts.push_back(entry.data());
    texts.push_back(nullptr);
    return AddStringList(nullptr, texts.data());
}

} // namespace

std::vector<std::string>
CalibrationTypeNames(const xercesc::DOMDocument *document) {
    const std::vector<std::string> kinds = LookupTableAttributes(document);
    std::vector<std::string> names;
    bool hasSigmaNought = false;
    for (const std::string &kind : kinds)
        hasSigmaNought = hasSigmaNought || IsSigmaNought(kind);
    if (hasSigmaNought)
        names.push_back(kDefaultKind);
    for (const std::string &kind : kinds)
        if (!IsSigmaNought(kind))
            names.push_back(kind);
    names.push_back(kNoCalibration);
    return names;
}

char *FindLookupTableFile(const xercesc::DOMDocument *document,
                          const ZirOdi2CalibImage *model, const char *pattern) {
    LookupTableFiles files;
    return FindLookupTableFile(document, model, pattern, files);
}

char *FindLookupTableFile(const xercesc::DOMDocument *document,
                          const ZirOdi2CalibImage *model, const char *pattern,
                          LookupTableFiles &files) {
    return LookupTablePath(document, model, pattern, nullptr, files);
}

char *SelectCalibrationFile(const xercesc::DOMDocument *document,
                            ZirOdi2CalibImage *model, const char *pattern,
                            LookupTableFiles &files) {
    std::string kind;
    char *path = LookupTablePath(document, model,
                                 pattern != nullptr ? pattern : kDefaultKind,
                                 &kind, files);
    if (path != nullptr)
        model->SetCalibrationType(kind.c_str());
    return path;
}

std::unique_ptr<LookupTable> ReadLookupTableFile(const char *path) {
    if (path == nullptr)
        return nullptr;
    return UnlessParseFails<std::unique_ptr<LookupTable>>(
        [path] { return ParseLookupTableFile(path); });
}

bool LookupTableFiles::Admits(const char *directory, const char *name) {
    const bool namedInside = IsNameInsideProduct(name);
    const ProductFile file =
        namedInside ? ResolveProductFile(directory, name) : ProductFile{};
    if (namedInside && (file.place == ProductFilePlace::Inside ||
                        file.place == ProductFilePlace::Missing))
        return true;
    const std::string refused = name;
    if (std::find(refusedNames.begin(), refusedNames.end(), refused) !=
        refusedNames.end())
        return false;
    refusedNames.push_back(refused);
    if (namedInside)
        IMPError(-1, host::kWarning, "%s",
                 UnreadableProductFileText(file).c_str());
    else
        WarnNameOutsideProduct(name);
    return false;
}

const LookupTable *LookupTableFiles::Read(const char *path) {
    if (path == nullptr)
        return nullptr;
    for (const auto &entry : tables)
        if (entry.first == path)
            return entry.second.get();
    tables.emplace_back(path, ReadLookupTableFile(path));
    return tables.back().second.get();
}

void LoadCalibration(const xercesc::DOMDocument *document,
                     ZirOdi2CalibImage *model, const char *option) {
    LookupTableFiles files;
    LoadCalibration(document, model, option, files);
}

void LoadCalibration(const xercesc::DOMDocument *document,
                     ZirOdi2CalibImage *model, const char *option,
                     LookupTableFiles &files) {
    if (document == nullptr || model == nullptr)
        return;
    HostText path(SelectCalibrationFile(document, model, option, files));
    if (!path) {
        WarnWithoutCalibration(model, _(kNoLookupTableName));
        return;
    }
    if (DKCheck(path.get()) == 0) {
        WarnWithoutCalibration(model,
                               MkName(_(kLookupTableMissing), path.get()));
        return;
    }
    // A file that cannot be read as a table is reported like a missing one:
    // keeping the selected kind would label raw values as calibrated.
    const LookupTable *table = files.Read(path.get());
    if (table == nullptr) {
        WarnWithoutCalibration(model,
                               MkName(_(kLookupTableUnreadable), path.get()));
        return;
    }
    const long long columns = ImageColumns(document, *model);
    if (table->Size() < static_cast<unsigned long long>(columns)) {
        WarnWithoutCalibration(model,
                               MkName(_(kLookupTableTooShort), path.get(),
                                      table->Size(), columns));
        return;
    }
    model->CalibrationTable() = *table;
}

void ReadIncidenceAngles(const xercesc::DOMDocument *document,
                         ZirOdi2CalibImage *model, IncidenceFormula formula) {
    LookupTableFiles files;
    ReadIncidenceAngles(document, model, formula, files);
}

void ReadIncidenceAngles(const xercesc::DOMDocument *document,
                         ZirOdi2CalibImage *model, IncidenceFormula formula,
                         LookupTableFiles &files) {
    if (document == nullptr || model == nullptr)
        return;
    HostText sigmaPath(FindLookupTableFile(document, model, "Sigma", files));
    HostText betaPath(FindLookupTableFile(document, model, "Beta", files));
    if (!sigmaPath || !betaPath)
        return;
    const LookupTable *sigma = files.Read(sigmaPath.get());
    const LookupTable *beta = files.Read(betaPath.get());
    if (sigma == nullptr || beta == nullptr)
        return;
    // One angle per Sigma column; a shorter Beta table reads 1.0 past its
    // end. A ratio above 1 gives a not-a-number angle, kept as it is.
    LookupTable angles(sigma->Size());
    angles.Resize(sigma->Size());
    for (std::size_t i = 0; i < sigma->Size(); ++i)
        angles.Set(i, IncidenceDegrees(beta->Get(i), sigma->Get(i), formula));
    model->IncidenceTable() = std::move(angles);
}

char **ListCalibrationTypes(const char *path) {
    if (path == nullptr)
        return nullptr;
    // A table operation of the driver: nothing but host reports may leave.
    if (std::optional<DescriptionFacts> facts = RecalledDescriptionFacts(path))
        return CalibrationTypeList(facts->calibrationTypes);
    return UnlessParseFails<char **>([path]() -> char ** {
        DocumentParse parse(path);
        if (parse.Document() == nullptr)
            return nullptr;
        return CalibrationTypeList(CalibrationTypeNames(parse.Document()));
    });
}
