#pragma once

#include "host/XmlUtil.hpp"

#include <cstddef>
#include <memory>
#include <string>
#include <vector>

#include <xercesc/dom/DOMDocument.hpp>
#include <xercesc/dom/DOMElement.hpp>
#include <xercesc/parsers/XercesDOMParser.hpp>

class ElementIndex;

/// The largest product description parsed. A real one holds about half a
/// MiB and one with a dense grid of 200,000 tie points about 42 MiB; the
/// parsed document takes several times its file's size, so the limit keeps
/// the parse of the largest accepted file well under a GiB.
constexpr std::size_t kMaxDescriptionBytes = 48u << 20;

/// A parsed XML file of a product. The document lives exactly as long as
/// this object. A top-level parse (the product description) holds one XML
/// platform initialisation, released once on every way out; a nested parse
/// (look-up table files read while the description is parsed) runs under
/// the initialisation already in force.
///
/// Only a regular local file is read, and only that file: nothing is fetched
/// over the network and no DTD or external entity is loaded. A document with
/// a document type declaration, or with elements nested more than 100 deep,
/// is refused: the constructor throws host::ReportedError with a message
/// naming the file. A document the parser built despite other errors (a file
/// cut short, say) is used as it stands.
class DocumentParse {
  public:
    enum class Platform { Initialize, AlreadyInitialized };

    /// Parses the file at path, a product description: one larger than
    /// kMaxDescriptionBytes is refused as above, unread.
    explicit DocumentParse(const char *path,
                           Platform platform = Platform::Initialize);
    /// Parses bytes read from the file path names (which only labels it).
    DocumentParse(const std::string &bytes, const char *path,
                  Platform platform);
    ~DocumentParse();
    DocumentParse(const DocumentParse &) = delete;
    DocumentParse &operator=(const DocumentParse &) = delete;

    /// The document, or null when the platform could not be initialised,
    /// the path is not a regular file or the parse gave no document.
    xercesc::DOMDocument *Document() const { return document; }

  private:
    // Parses *bytes; without bytes (no readable file) there is no document.
    DocumentParse(const std::string *bytes, const char *path,
                  Platform platform);
    void Parse(const std::string &bytes, const char *path);

    bool platformHeld = false;
    std::unique_ptr<xercesc::XercesDOMParser> parser;
    xercesc::DOMDocument *document = nullptr;
    // The elements of the document by name, which the lookups below use
    // instead of walking the whole document for each of them.
    std::unique_ptr<ElementIndex> index;
};

/// Text of the first element of tag anywhere in the document, as a host
/// string the caller frees; "" when there is none; null when document or
/// tag is missing.
char *ElementText(const xercesc::DOMDocument *document, const char *tag);
/// The same text as an XmlTranscode value (empty when there is none).
XmlTranscode ElementTextTranscoded(const xercesc::DOMDocument *document,
                                   const char *tag);
/// The elements of tag anywhere in the document, in document order (as the
/// DOM's getElementsByTagName lists them); empty when document or tag is
/// missing. Served from an index for documents of a DocumentParse.
std::vector<const xercesc::DOMElement *>
ElementsByTag(const xercesc::DOMDocument *document, const char *tag);
/// The number of elements of tag anywhere in the document.
std::size_t CountElementsByTag(const xercesc::DOMDocument *document,
                               const char *tag);
/// The first element of tag anywhere in the document, in document order;
/// null when there is none or document or tag is missing.
const xercesc::DOMElement *
FirstElementByTag(const xercesc::DOMDocument *document, const char *tag);
/// Text content of a node (all text below it, untrimmed), narrow.
std::string NodeText(const xercesc::DOMNode *node);

enum class AttributeMatch {
    EqualIgnoringCase,    // the whole value equals the pattern
    ContainsIgnoringCase, // the value contains the pattern
};

/// Text of the first element of tag (document order) with an attribute
/// (attribute-map order) whose value matches pattern, as a host string the
/// caller frees; null when none matches. matchedValue, when given, receives
/// the matching attribute value as written.
char *FindTextByAttribute(const xercesc::DOMDocument *document, const char *tag,
                          AttributeMatch rule, const char *pattern,
                          std::string *matchedValue = nullptr);

/// Splits text at every one of the separator characters; empty tokens are
/// kept (an empty text gives one empty token).
std::vector<std::string> SplitTokens(const std::string &text,
                                     const char *separators);
