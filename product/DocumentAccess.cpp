#include "product/DocumentAccess.hpp"

#include "host/ErrorReports.hpp"
#include "host/TextServices.hpp"
#include "product/BoundedFileRead.hpp"

#include <cstring>
#include <string>
#include <string_view>
#include <strings.h>
#include <unordered_map>
#include <utility>

#include <boost/algorithm/string/classification.hpp>
#include <boost/algorithm/string/split.hpp>
#include <boost/range/iterator_range.hpp>

#include <xercesc/dom/DOMElement.hpp>
#include <xercesc/dom/DOMNamedNodeMap.hpp>
#include <xercesc/dom/DOMNode.hpp>
#include <xercesc/dom/DOMNodeList.hpp>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/framework/XMLAttr.hpp>
#include <xercesc/framework/XMLElementDecl.hpp>
#include <xercesc/internal/XMLScanner.hpp>
#include <xercesc/sax/Locator.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/RefVectorOf.hpp>
#include <xercesc/util/SecurityManager.hpp>
#include <xercesc/util/XMLString.hpp>
#include <xercesc/validators/DTD/DTDElementDecl.hpp>

using xercesc::DOMDocument;
using xercesc::DOMElement;
using xercesc::DOMNode;
using xercesc::DOMNodeList;
using xercesc::XercesDOMParser;

// The elements of one document by name, each list in document order. Built
// by one walk of the document on the first lookup; the documents of a
// product are never changed after parsing, so it never goes stale.
class ElementIndex {
  public:
    explicit ElementIndex(const DOMDocument *documentIn)
        : document(documentIn) {}

    // The elements named tag; null when there are none.
    const std::vector<const DOMElement *> *Find(const XMLCh *tag) {
        if (!built)
            Build();
        auto found = elements.find(tag);
        return found != elements.end() ? &found->second : nullptr;
    }

  private:
    // A pre-order walk, as getElementsByTagName takes, that keeps its own
    // stack of ancestors: asking a Xerces node for its parent is costly, and
    // recursion would let the nesting depth of a file decide the stack depth.
    void Build() {
        built = true;
        std::vector<const DOMNode *> ancestors;
        const DOMNode *node = document->getFirstChild();
        while (node != nullptr) {
            if (node->getNodeType() == DOMNode::ELEMENT_NODE)
                elements[node->getNodeName()].push_back(
                    static_cast<const DOMElement *>(node));
            if (const DOMNode *child = node->getFirstChild()) {
                ancestors.push_back(node);
                node = child;
                continue;
            }
            while (node != nullptr && node->getNextSibling() == nullptr) {
                node = ancestors.empty() ? nullptr : ancestors.back();
                if (!ancestors.empty())
                    ancestors.pop_back();
            }
            if (node != nullptr)
                node = node->getNextSibling();
        }
    }

    const DOMDocument *document;
    bool built = false;
    // Keyed by the names the document holds, which live as long as it: no
    // copy of a name per element.
    std::unordered_map<std::basic_string_view<XMLCh>,
                       std::vector<const DOMElement *>>
        elements;
};

namespace {

// The indexes of the documents that DocumentParse objects hold, at most a
// product description and a look-up table file at a time. They are kept
// here rather than as user data on the document: a document carrying user
// data visits every one of its nodes when it is released.
std::vector<std::pair<const DOMDocument *, ElementIndex *>> &LiveIndexes() {
    static std::vector<std::pair<const DOMDocument *, ElementIndex *>> live;
    return live;
}

ElementIndex *IndexOf(const DOMDocument *document) {
    for (const auto &entry : LiveIndexes())
        if (entry.first == document)
            return entry.second;
    return nullptr;
}

void ForgetIndex(const ElementIndex *index) {
    auto &live = LiveIndexes();
    for (auto entry = live.begin(); entry != live.end(); ++entry) {
        if (entry->second == index) {
            live.erase(entry);
            return;
        }
    }
}

// Visits the elements of tag in document order until visit returns true;
// returns that element, or null when there is none. Documents of a
// DocumentParse are served from their index; any other document through
// the DOM's own list, whose item() answers null past the end (asking for
// its length would cost one more walk of the document).
template <class Visit>
const DOMElement *FindElement(const DOMDocument *document, const char *tag,
                              Visit visit) {
    if (document == nullptr || tag == nullptr)
        return nullptr;
    XmlTranscode name(tag);
    ElementIndex *index = IndexOf(document);
    if (index != nullptr && std::strcmp(tag, "*") != 0) {
        if (const auto *elements = index->Find(name)) {
            for (const DOMElement *element : *elements)
                if (visit(element))
                    return element;
        }
        return nullptr;
    }
    DOMNodeList *elements = document->getElementsByTagName(name);
    if (elements == nullptr)
        return nullptr;
    for (XMLSize_t i = 0; const DOMNode *node = elements->item(i); ++i) {
        const auto *element = static_cast<const DOMElement *>(node);
        if (visit(element))
            return element;
    }
    return nullptr;
}

// Releases a buffer that XMLString::transcode allocated: narrow text in the
// local code page made of XMLCh text.
template <class To, class From> struct Transcoded {
    To *text;
    explicit Transcoded(const From *source)
        : text(xercesc::XMLString::transcode(source)) {}
    ~Transcoded() { xercesc::XMLString::release(&text); }
    Transcoded(const Transcoded &) = delete;
    Transcoded &operator=(const Transcoded &) = delete;
};

// The error code the host gives a file it refuses to read.
constexpr int32_t kErrUnreadableFile = 3;

// The most entity references a document may expand. The XML files of a
// product declare no entities (the predefined ones and character references
// do not count), and a document that could declare any is refused before its
// declarations are read; the limit is a second line behind that.
constexpr XMLSize_t kEntityExpansionLimit = 100;
// The deepest nesting of elements a document may have. The XML files of a
// product nest theirs fewer than ten deep; the parser's text of an element
// recurses through every level below it, so a file nested a million deep
// would overflow the stack.
constexpr int kMaxElementDepth = 100;

// A DOM parser that reads the one local file it is given and nothing else.
// A document type declaration ends the parse as soon as its name is read,
// before its internal subset or any external DTD: no DTD is ever loaded, no
// entity of the document is declared, and nothing is fetched. Should an
// entity ever be declared, none is resolved outside the document and their
// expansion is capped. Elements nested deeper than any product's end the
// parse too.
class ProductDomParser : public XercesDOMParser {
  public:
    // Thrown out of the parse when the document is refused.
    struct Refused {
        std::string reason;
        XMLFileLoc line;
    };

    ProductDomParser()
        : XercesDOMParser(nullptr, xercesc::XMLPlatformUtils::fgMemoryManager,
                          nullptr) {
        setValidationScheme(XercesDOMParser::Val_Always);
        setLoadExternalDTD(false);
        setDisableDefaultEntityResolution(true);
        securityManager.setEntityExpansionLimit(kEntityExpansionLimit);
        setSecurityManager(&securityManager);
    }

    void doctypeDecl(const xercesc::DTDElementDecl &, const XMLCh *,
                     const XMLCh *, bool, bool) override {
        Refuse("it declares a document type");
    }

    // The parser reports the end of every element, an empty one included,
    // so every start counts one level.
    void startElement(const xercesc::XMLElementDecl &element,
                      unsigned int urlId, const XMLCh *prefix,
                      const xercesc::RefVectorOf<xercesc::XMLAttr> &attributes,
                      XMLSize_t attributeCount, bool isEmpty,
                      bool isRoot) override {
        if (++depth > kMaxElementDepth)
            Refuse("its elements nest more than " +
                   std::to_string(kMaxElementDepth) + " deep");
        XercesDOMParser::startElement(element, urlId, prefix, attributes,
                                      attributeCount, isEmpty, isRoot);
    }

    void endElement(const xercesc::XMLElementDecl &element, unsigned int urlId,
                    bool isRoot, const XMLCh *prefix) override {
        --depth;
        XercesDOMParser::endElement(element, urlId, isRoot, prefix);
    }

  private:
    [[noreturn]] void Refuse(const std::string &reason) const {
        const xercesc::Locator *locator = getScanner()->getLocator();
        throw Refused{reason,
                      locator != nullptr ? locator->getLineNumber() : 0};
    }

    xercesc::SecurityManager securityManager;
    int depth = 0; // elements open at the point of the parse
};

// Reports the refusal; an error report does not come back.
void RefuseDocument(const char *path, const std::string &reason) {
    IMPError(kErrUnreadableFile, host::kError,
             "Refused %s: %s, which the XML files of a product never do", path,
             reason.c_str());
}

// Parses bytes read from path. The parser is handed the bytes, never the
// path: a path that happens to read as a URL is never fetched, and a path
// that is not text in any encoding is read all the same. A refused document
// is reported with the host's error report.
void ParseBytes(ProductDomParser &parser, const std::string &bytes,
                const char *path) {
    const XmlTranscode label(path);
    xercesc::MemBufInputSource source(
        reinterpret_cast<const XMLByte *>(bytes.data()), bytes.size(), label);
    try {
        parser.parse(source);
    } catch (const ProductDomParser::Refused &refused) {
        RefuseDocument(path, refused.reason + " (line " +
                                 std::to_string(refused.line) + ")");
    }
}

// The bytes of the product description at path; null when there is no
// regular file to read there. One too large to be a product description is
// refused unread.
std::unique_ptr<std::string> DescriptionBytes(const char *path) {
    FileBytes file = ReadFileUpTo(path, kMaxDescriptionBytes);
    if (file.status == FileReadStatus::TooLarge)
        RefuseDocument(path,
                       "it holds more than " + SizeText(kMaxDescriptionBytes));
    if (file.status != FileReadStatus::Read)
        return nullptr;
    return std::make_unique<std::string>(std::move(file.bytes));
}

// The text content of node. getTextContent copies it into the document's
// memory, which keeps every copy until the document is released; an element
// whose one child is a text node, as nearly every element of a product
// description is, holds the same text in that node.
const XMLCh *TextContent(const DOMNode *node) {
    const DOMNode *child = node->getFirstChild();
    if (node->getNodeType() == DOMNode::ELEMENT_NODE && child != nullptr &&
        child->getNextSibling() == nullptr &&
        child->getNodeType() == DOMNode::TEXT_NODE)
        return child->getNodeValue();
    return node->getTextContent();
}

// The narrow text XMLString::transcode gives for text ("" for null). Text
// all in ASCII, as product descriptions and look-up tables are, reads the
// same in every local code page and is copied directly: transcoding costs
// several times more, which counts for the many thousand numbers of a
// look-up table.
std::string NarrowText(const XMLCh *text) {
    if (text == nullptr)
        return std::string();
    std::string narrow(std::char_traits<XMLCh>::length(text), '\0');
    XMLCh seen = 0;
    for (std::size_t i = 0; i < narrow.size(); ++i) {
        seen |= text[i];
        narrow[i] = static_cast<char>(text[i]);
    }
    if (seen < 0x80)
        return narrow;
    Transcoded<char, XMLCh> transcoded(text);
    return transcoded.text != nullptr ? std::string(transcoded.text)
                                      : std::string();
}

// The text content of node as a host string the caller frees.
char *HostTextContent(const DOMNode *node) {
    return HString(NarrowText(TextContent(node)).c_str());
}

std::string LowerCase(std::string text) {
    LCaseString(text.data());
    return text;
}

bool Matches(const std::string &value, AttributeMatch rule,
             const char *pattern) {
    switch (rule) {
    case AttributeMatch::EqualIgnoringCase:
        return strcasecmp(value.c_str(), pattern) == 0;
    case AttributeMatch::ContainsIgnoringCase:
        return LowerCase(value).find(LowerCase(pattern)) != std::string::npos;
    }
    return false;
}

// True when an attribute of element matches pattern; the first match in
// attribute-map order goes to matchedValue.
bool HasMatchingAttribute(const DOMNode *element, AttributeMatch rule,
                          const char *pattern, std::string *matchedValue) {
    const xercesc::DOMNamedNodeMap *attributes = element->getAttributes();
    if (attributes == nullptr)
        return false;
    for (XMLSize_t i = 0; i < attributes->getLength(); ++i) {
        std::string value = XmlTranscode(attributes->item(i)->getNodeValue());
        if (!Matches(value, rule, pattern))
            continue;
        if (matchedValue != nullptr)
            *matchedValue = value;
        return true;
    }
    return false;
}

} // namespace

DocumentParse::DocumentParse(const char *path, Platform platform)
    : DocumentParse(DescriptionBytes(path).get(), path, platform) {}

DocumentParse::DocumentParse(const std::string &bytes, const char *path,
                             Platform platform)
    : DocumentParse(&bytes, path, platform) {}

DocumentParse::DocumentParse(const std::string *bytes, const char *path,
                             Platform platform) {
    if (bytes == nullptr)
        return;
    // A nested parse relies on the initialisation of the parse around it;
    // should there be none, it holds one of its own rather than run the
    // parser on an uninitialised platform.
    bool needsPlatform =
        platform == Platform::Initialize || ORV_XMLUtil::InitializeCount() == 0;
    if (needsPlatform) {
        if (ORV_XMLUtil::Initialize() == 0)
            return;
        platformHeld = true;
    }
    try {
        Parse(*bytes, path);
    } catch (...) {
        // The destructor does not run for a constructor that throws.
        ForgetIndex(index.get());
        index.reset();
        parser.reset();
        if (platformHeld)
            ORV_XMLUtil::Terminate();
        throw;
    }
    if (document == nullptr) {
        parser.reset();
        if (platformHeld)
            ORV_XMLUtil::Terminate();
        platformHeld = false;
    }
}

void DocumentParse::Parse(const std::string &bytes, const char *path) {
    auto productParser = std::make_unique<ProductDomParser>();
    ProductDomParser &parsing = *productParser;
    parser = std::move(productParser);
    ParseBytes(parsing, bytes, path);
    document = parser->getDocument();
    if (document != nullptr) {
        index = std::make_unique<ElementIndex>(document);
        LiveIndexes().emplace_back(document, index.get());
    }
}

DocumentParse::~DocumentParse() {
    ForgetIndex(index.get());
    // The parser owns the document and needs the platform to release it.
    parser.reset();
    if (platformHeld)
        ORV_XMLUtil::Terminate();
}

std::string NodeText(const DOMNode *node) {
    if (node == nullptr)
        return std::string();
    return NarrowText(TextContent(node));
}

char *ElementText(const DOMDocument *document, const char *tag) {
    if (document == nullptr || tag == nullptr)
        return nullptr;
    const DOMNode *element = FirstElementByTag(document, tag);
    return element != nullptr ? HostTextContent(element) : HString("");
}

XmlTranscode ElementTextTranscoded(const DOMDocument *document,
                                   const char *tag) {
    XmlTranscode text;
    if (const DOMNode *element = FirstElementByTag(document, tag))
        text = XmlTranscode(TextContent(element));
    return text;
}

char *FindTextByAttribute(const DOMDocument *document, const char *tag,
                          AttributeMatch rule, const char *pattern,
                          std::string *matchedValue) {
    if (pattern == nullptr)
        return nullptr;
    const DOMElement *element =
        FindElement(document, tag, [&](const DOMElement *candidate) {
            return HasMatchingAttribute(candidate, rule, pattern, matchedValue);
        });
    return element != nullptr ? HostTextContent(element) : nullptr;
}

std::vector<const DOMElement *> ElementsByTag(const DOMDocument *document,
                                              const char *tag) {
    std::vector<const DOMElement *> elements;
    FindElement(document, tag, [&](const DOMElement *element) {
        elements.push_back(element);
        return false;
    });
    return elements;
}

const DOMElement *FirstElementByTag(const DOMDocument *document,
                                    const char *tag) {
    return FindElement(document, tag, [](const DOMElement *) { return true; });
}

std::size_t CountElementsByTag(const DOMDocument *document, const char *tag) {
    std::size_t count = 0;
    FindElement(document, tag, [&](const DOMElement *) {
        ++count;
        return false;
    });
    return count;
}

std::vector<std::string> SplitTokens(const std::string &text,
                                     const char *separators) {
    // Split into ranges first and copy once: lists of many thousand gains
    // would otherwise spend their time moving strings while the vector
    // grows.
    std::vector<boost::iterator_range<std::string::const_iterator>> ranges;
    boost::algorithm::split(
        ranges, text,
        boost::algorithm::is_any_of(separators != nullptr ? separators : ""),
        boost::algorithm::token_compress_off);
    std::vector<std::string> tokens;
    tokens.reserve(ranges.size());
    for (const auto &range : ranges)
        tokens.emplace_back(range.begin(), range.end());
    return tokens;
}
