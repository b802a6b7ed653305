#include "product/DocumentAccess.hpp"

#include "host/TextServices.hpp"

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
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLString.hpp>

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

// Releases a buffer that XMLString::transcode allocated.
struct TranscodedText {
    char *text;
    explicit TranscodedText(const XMLCh *source)
        : text(xercesc::XMLString::transcode(source)) {}
    ~TranscodedText() { xercesc::XMLString::release(&text); }
    TranscodedText(const TranscodedText &) = delete;
    TranscodedText &operator=(const TranscodedText &) = delete;
};

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
    TranscodedText transcoded(text);
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

DocumentParse::DocumentParse(const char *path, Platform platform) {
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
        parser = std::make_unique<XercesDOMParser>(
            nullptr, xercesc::XMLPlatformUtils::fgMemoryManager, nullptr);
        parser->setValidationScheme(XercesDOMParser::Val_Always);
        if (path != nullptr)
            parser->parse(path);
        document = parser->getDocument();
        if (document != nullptr) {
            index = std::make_unique<ElementIndex>(document);
            LiveIndexes().emplace_back(document, index.get());
        }
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
