// The calibration look-up tables of a product: product.xml names one file per
// calibration kind in its lookupTable elements (the kind in an attribute, the
// file name as text); each file holds an offset and one gain per range
// column.

#include "product/CalibrationTables.hpp"

#include "host/ErrorReports.hpp"
#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "model/LookupTable.hpp"
#include "model/ZirOdi2CalibImage.hpp"
#include "product/DocumentAccess.hpp"

#include <cmath>
#include <cstdlib>
#include <locale>
#include <new>
#include <sstream>
#include <string>
#include <strings.h>

#include <xercesc/dom/DOMException.hpp>
#include <xercesc/dom/DOMNamedNodeMap.hpp>
#include <xercesc/dom/DOMNode.hpp>
#include <xercesc/dom/DOMNodeList.hpp>
#include <xercesc/sax/SAXException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

namespace {

struct FreeDeleter {
    void operator()(void *memory) const { std::free(memory); }
};
using HostText = std::unique_ptr<char, FreeDeleter>;

struct StringListDeleter {
    void operator()(char **list) const { DestroyStringList(list); }
};
using HostList = std::unique_ptr<char *, StringListDeleter>;

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

// The path of the table file whose lookupTable attribute contains pattern,
// joined to the product directory (which ends in its separator), as a host
// string the caller frees. matchedValue receives the attribute as written.
char *LookupTablePath(const xercesc::DOMDocument *document,
                      const ZirOdi2CalibImage *model, const char *pattern,
                      std::string *matchedValue) {
    if (document == nullptr || model == nullptr || pattern == nullptr)
        return nullptr;
    HostText fileName(FindTextByAttribute(document, kLookupTableTag,
                                          AttributeMatch::ContainsIgnoringCase,
                                          pattern, matchedValue));
    if (!fileName)
        return nullptr;
    // Without a product directory the file name is taken as it stands.
    const char *directory = model->GetProductDirectory();
    std::string path = directory != nullptr ? directory : "";
    path += fileName.get();
    return HString(path.c_str());
}

// Takes over a host text; a missing one reads as empty.
std::string TextOf(char *text) {
    const HostText owner(text);
    return owner ? std::string(owner.get()) : std::string();
}

// The gains text holds one number per column separated by single spaces.
// Every token gives one entry; tokens that hold no number are skipped, so
// the parsed numbers are packed from entry 0 and the entries left over after
// the last one stay 0.0.
void ParseGains(const std::string &text, LookupTable &table) {
    const std::vector<std::string> tokens = SplitTokens(text, " ");
    table.Resize(tokens.size());
    std::istringstream stream;
    stream.imbue(std::locale::classic());
    std::size_t k = 0;
    for (const std::string &token : tokens) {
        stream.clear();
        stream.str(token);
        float value = 0.0f;
        if (stream >> value)
            table.Set(k++, value);
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

// Reads a table file while the product description's parse holds the XML
// platform; null when the file gives no document.
std::unique_ptr<LookupTable> ParseLookupTableFile(const char *path) {
    DocumentParse parse(path, DocumentParse::Platform::AlreadyInitialized);
    const xercesc::DOMDocument *document = parse.Document();
    if (document == nullptr)
        return nullptr;
    const std::string offsetText = TextOf(ElementText(document, "offset"));
    const std::string gainsText = TextOf(ElementText(document, "gains"));
    auto table = std::make_unique<LookupTable>();
    table->SetOffset(static_cast<float>(std::atof(offsetText.c_str())));
    ParseGains(gainsText, *table);
    return table;
}

void WarnWithoutCalibration(ZirOdi2CalibImage *model, const char *message) {
    IMPError(-1, host::kWarning, "%s", message);
    model->SetCalibrationType(kNoCalibration);
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

// Appends ":Calibration Type:" + kind to the list, which it replaces.
void AddCalibrationType(HostList &list, const std::string &kind) {
    const std::string entry = kCalibrationTypePrefix + kind;
    list.reset(AddStringToList(list.release(), entry.c_str()));
}

// The attribute values of every lookupTable element, elements in document
// order, attributes in attribute-map order.
std::vector<std::string>
LookupTableAttributes(const xercesc::DOMDocument *document) {
    std::vector<std::string> values;
    const XmlTranscode tag(kLookupTableTag);
    const xercesc::DOMNodeList *elements = document->getElementsByTagName(tag);
    const XMLSize_t elementCount =
        elements != nullptr ? elements->getLength() : 0;
    for (XMLSize_t i = 0; i < elementCount; ++i) {
        const xercesc::DOMNamedNodeMap *attributes =
            elements->item(i)->getAttributes();
        const XMLSize_t attributeCount =
            attributes != nullptr ? attributes->getLength() : 0;
        for (XMLSize_t a = 0; a < attributeCount; ++a)
            values.push_back(
                XmlTranscode(attributes->item(a)->getNodeValue()).Narrow());
    }
    return values;
}

char **CalibrationTypeList(const xercesc::DOMDocument *document) {
    const std::vector<std::string> kinds = LookupTableAttributes(document);
    HostList list;
    bool hasSigmaNought = false;
    for (const std::string &kind : kinds)
        hasSigmaNought = hasSigmaNought || IsSigmaNought(kind);
    if (hasSigmaNought)
        AddCalibrationType(list, kDefaultKind);
    for (const std::string &kind : kinds)
        if (!IsSigmaNought(kind))
            AddCalibrationType(list, kind);
    AddCalibrationType(list, kNoCalibration);
    return list.release();
}

} // namespace

char *FindLookupTableFile(const xercesc::DOMDocument *document,
                          const ZirOdi2CalibImage *model, const char *pattern) {
    return LookupTablePath(document, model, pattern, nullptr);
}

char *SelectCalibrationFile(const xercesc::DOMDocument *document,
                            ZirOdi2CalibImage *model, const char *pattern) {
    std::string kind;
    char *path = LookupTablePath(
        document, model, pattern != nullptr ? pattern : kDefaultKind, &kind);
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

void LoadCalibration(const xercesc::DOMDocument *document,
                     ZirOdi2CalibImage *model, const char *option) {
    if (document == nullptr || model == nullptr)
        return;
    HostText path(SelectCalibrationFile(document, model, option));
    if (!path) {
        WarnWithoutCalibration(model, _(kNoLookupTableName));
        return;
    }
    if (DKCheck(path.get()) == 0) {
        WarnWithoutCalibration(model,
                               MkName(_(kLookupTableMissing), path.get()));
        return;
    }
    // A file that gives no document leaves the earlier table in place; the
    // kind stays the one selected.
    std::unique_ptr<LookupTable> table = ReadLookupTableFile(path.get());
    if (table)
        model->CalibrationTable() = std::move(*table);
}

void ReadIncidenceAngles(const xercesc::DOMDocument *document,
                         ZirOdi2CalibImage *model, IncidenceFormula formula) {
    if (document == nullptr || model == nullptr)
        return;
    HostText sigmaPath(FindLookupTableFile(document, model, "Sigma"));
    HostText betaPath(FindLookupTableFile(document, model, "Beta"));
    if (!sigmaPath || !betaPath)
        return;
    const std::unique_ptr<LookupTable> sigma =
        ReadLookupTableFile(sigmaPath.get());
    const std::unique_ptr<LookupTable> beta =
        ReadLookupTableFile(betaPath.get());
    if (!sigma || !beta)
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
    return UnlessParseFails<char **>([path]() -> char ** {
        DocumentParse parse(path);
        if (parse.Document() == nullptr)
            return nullptr;
        return CalibrationTypeList(parse.Document());
    });
}
