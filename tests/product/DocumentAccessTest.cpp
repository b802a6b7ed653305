#include "product/DocumentAccess.hpp"

#include "host/HostMemory.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"

#include <gtest/gtest.h>

#include <xercesc/dom/DOMNodeList.hpp>
#include <xercesc/util/XMLString.hpp>

#include <stdexcept>
#include <string>
#include <vector>

namespace {

using host::HostText;

std::string WriteFile(const rs2test::TempDir &dir, const std::string &name,
                      const std::string &text) {
    return rs2test::WriteFile(dir.File(name), text);
}

// A parse of XML text written to a temporary file.
class ParsedText {
  public:
    explicit ParsedText(const std::string &text)
        : parse(WriteFile(dir, "document.xml", text).c_str()) {}
    const xercesc::DOMDocument *Document() const { return parse.Document(); }

  private:
    rs2test::TempDir dir;
    DocumentParse parse;
};

std::string OrNull(char *text) {
    HostText owner(text);
    return owner ? std::string(owner.get()) : std::string("<null>");
}

const char *const kProduct = R"(<?xml version="1.0" encoding="UTF-8"?>
<product xmlns="http://www.rsi.ca/rs2/prod/xml/schemas">
  <sourceAttributes>
    <radarParameters>
      <productType>deep</productType>
    </radarParameters>
  </sourceAttributes>
  <productType>shallow</productType>
  <emptyElement></emptyElement>
  <site> Montr&#233;al <city>North</city> Vancouver </site>
  <imageAttributes>
    <fullResolutionImageData pole="hv">imagery_HV.tif</fullResolutionImageData>
    <fullResolutionImageData pole="hh">imagery_HH.tif</fullResolutionImageData>
    <fullResolutionImageData pole="HH">second_HH.tif</fullResolutionImageData>
    <lookupTable kind="table" incidenceAngleCorrection="Beta Nought">lutBeta.xml</lookupTable>
    <lookupTable incidenceAngleCorrection="Sigma Nought">lutSigma.xml</lookupTable>
    <lookupTable incidenceAngleCorrection="Gamma">lutGamma.xml</lookupTable>
  </imageAttributes>
</product>
)";

TEST(ElementText, gives_all_text_below_the_first_element_of_a_tag) {
    ParsedText parsed(kProduct);
    ASSERT_NE(parsed.Document(), nullptr);
    const std::pair<const char *, const char *> cases[] = {
        // The nested productType comes first in the file, so it wins over the
        // shallower one that follows.
        {"productType", "deep"},
        // The text of child elements joins in, untrimmed.
        {"site", " Montr\xC3\xA9"
                 "al North Vancouver "},
        // Absent and empty elements give empty texts; tags match as written,
        // case included.
        {"noSuchElement", ""},
        {"emptyElement", ""},
        {"PRODUCTTYPE", ""},
    };
    for (const auto &[tag, text] : cases) {
        EXPECT_EQ(OrNull(ElementText(parsed.Document(), tag)), text) << tag;
        const XmlTranscode wide = ElementTextTranscoded(parsed.Document(), tag);
        EXPECT_EQ(wide.Narrow(), text) << tag;
        EXPECT_EQ(wide.Empty(), *text == '\0') << tag;
    }
    // Missing input gives no text at all.
    EXPECT_EQ(OrNull(ElementText(nullptr, "productType")), "<null>");
    EXPECT_EQ(OrNull(ElementText(parsed.Document(), nullptr)), "<null>");
    EXPECT_TRUE(ElementTextTranscoded(nullptr, "productType").Empty());
}

TEST(FindTextByAttribute, applies_the_match_rules_to_any_attribute) {
    ParsedText parsed(kProduct);
    ASSERT_NE(parsed.Document(), nullptr);
    struct Case {
        const char *tag;
        AttributeMatch rule;
        const char *pattern;
        const char *text;    // "<null>" when nothing matches
        const char *matched; // the attribute value that matched
    };
    constexpr AttributeMatch kEqual = AttributeMatch::EqualIgnoringCase;
    constexpr AttributeMatch kContains = AttributeMatch::ContainsIgnoringCase;
    // clang-format off
    const Case cases[] = {
        // Equality ignores case; the first match in document order wins.
        {"fullResolutionImageData", kEqual, "HH", "imagery_HH.tif", "hh"},
        {"fullResolutionImageData", kEqual, "Hv", "imagery_HV.tif", "hv"},
        // Equality is of the whole value.
        {"fullResolutionImageData", kEqual, "H", "<null>", ""},
        {"fullResolutionImageData", kEqual, "VV", "<null>", ""},
        // Containment ignores case on both sides.
        {"lookupTable", kContains, "sigma", "lutSigma.xml", "Sigma Nought"},
        {"lookupTable", kContains, "Sigma", "lutSigma.xml", "Sigma Nought"},
        {"lookupTable", kContains, "NOUGHT", "lutBeta.xml", "Beta Nought"},
        // The matching attribute need not be the first of its element.
        {"lookupTable", kContains, "beta", "lutBeta.xml", "Beta Nought"},
        {"lookupTable", kContains, "table", "lutBeta.xml", "table"},
        {"lookupTable", kEqual, "gamma", "lutGamma.xml", "Gamma"},
        {"lookupTable", kContains, "elevation", "<null>", ""},
        {"noSuchTag", kContains, "a", "<null>", ""},
    };
    // clang-format on
    for (const Case &c : cases) {
        std::string matched;
        EXPECT_EQ(OrNull(FindTextByAttribute(parsed.Document(), c.tag, c.rule,
                                             c.pattern, &matched)),
                  c.text)
            << c.tag << " " << c.pattern;
        EXPECT_EQ(matched, c.matched) << c.tag << " " << c.pattern;
    }
    EXPECT_EQ(OrNull(FindTextByAttribute(nullptr, "lookupTable", kEqual, "G")),
              "<null>");
    EXPECT_EQ(OrNull(FindTextByAttribute(parsed.Document(), "lookupTable",
                                         kEqual, nullptr)),
              "<null>");
}

// The DOM's own list of the elements of tag.
std::vector<const xercesc::DOMElement *>
DomElements(const xercesc::DOMDocument *document, const char *tag) {
    std::vector<const xercesc::DOMElement *> elements;
    xercesc::DOMNodeList *list =
        document->getElementsByTagName(XmlTranscode(tag));
    for (XMLSize_t i = 0; i < list->getLength(); ++i)
        elements.push_back(
            static_cast<const xercesc::DOMElement *>(list->item(i)));
    return elements;
}

TEST(ElementsByTag, lists_what_the_dom_lists_in_document_order) {
    ParsedText parsed(std::string(kProduct).replace(
        std::string(kProduct).find("<emptyElement>"), 0,
        "<x:prefixed xmlns:x=\"urn:x\">p</x:prefixed>"
        "<lookupTable>nested <lookupTable>inner</lookupTable></lookupTable>"));
    ASSERT_NE(parsed.Document(), nullptr);
    const char *tags[] = {"productType", "fullResolutionImageData",
                          "lookupTable", "site",
                          "city",        "x:prefixed",
                          "prefixed",    "*",
                          "product",     "noSuchElement"};
    for (const char *tag : tags) {
        std::vector<const xercesc::DOMElement *> expected =
            DomElements(parsed.Document(), tag);
        EXPECT_EQ(ElementsByTag(parsed.Document(), tag), expected) << tag;
        EXPECT_EQ(CountElementsByTag(parsed.Document(), tag), expected.size())
            << tag;
    }
    EXPECT_EQ(CountElementsByTag(parsed.Document(), "lookupTable"), 5u);
    EXPECT_EQ(OrNull(ElementText(parsed.Document(), "x:prefixed")), "p");
    EXPECT_EQ(OrNull(ElementText(parsed.Document(), "prefixed")), "");
    EXPECT_TRUE(ElementsByTag(nullptr, "site").empty());
    EXPECT_EQ(CountElementsByTag(parsed.Document(), nullptr), 0u);
}

TEST(ElementsByTag, serve_documents_of_other_parsers_alike) {
    rs2test::TempDir dir;
    std::string path = WriteFile(dir, "product.xml", kProduct);
    ASSERT_EQ(ORV_XMLUtil::Initialize(), 1);
    {
        // A document that no DocumentParse made, so it carries no index.
        xercesc::XercesDOMParser parser;
        parser.parse(path.c_str());
        const xercesc::DOMDocument *plain = parser.getDocument();
        DocumentParse indexed(path.c_str());
        ASSERT_NE(plain, nullptr);
        for (const char *tag : {"productType", "site", "lookupTable"}) {
            EXPECT_EQ(OrNull(ElementText(plain, tag)),
                      OrNull(ElementText(indexed.Document(), tag)));
            EXPECT_EQ(ElementsByTag(plain, tag).size(),
                      ElementsByTag(indexed.Document(), tag).size());
        }
        EXPECT_EQ(OrNull(FindTextByAttribute(
                      plain, "lookupTable",
                      AttributeMatch::ContainsIgnoringCase, "sigma")),
                  "lutSigma.xml");
    }
    ORV_XMLUtil::Terminate();
}

TEST(SplitTokens, keeps_every_empty_token) {
    struct Case {
        std::string text;
        const char *separators;
        std::vector<std::string> tokens;
    } cases[] = {
        {"HH HV", " ", {"HH", "HV"}},
        {"HH  HV", " ", {"HH", "", "HV"}},
        {"", " ", {""}},
        {"HH ", " ", {"HH", ""}},
        {" HH", " ", {"", "HH"}},
        // Only the given separators split: tabs and line breaks stay.
        {"HH\tHV VV\n", " ", {"HH\tHV", "VV\n"}},
        {"12:03:5.25", ":", {"12", "03", "5.25"}},
        {"a\n\nb\n", "\n", {"a", "", "b", ""}},
        {"a:b c", ": ", {"a", "b", "c"}},
    };
    for (const Case &c : cases)
        EXPECT_EQ(SplitTokens(c.text, c.separators), c.tokens)
            << "\"" << c.text << "\"";
}

TEST(DocumentParse, balances_the_platform_on_every_way_out) {
    rs2test::TempDir dir;
    std::string good = WriteFile(dir, "good.xml", "<a><b>text</b></a>");
    std::string missing = dir.File("missing.xml");
    const int start = ORV_XMLUtil::InitializeCount();
    {
        DocumentParse parse(good.c_str());
        ASSERT_NE(parse.Document(), nullptr);
        EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start + 1);
        // A nested parse runs under the initialisation in force.
        DocumentParse nested(good.c_str(),
                             DocumentParse::Platform::AlreadyInitialized);
        EXPECT_NE(nested.Document(), nullptr);
        EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start + 1);
    }
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start);
    {
        // Without an outer parse a nested one holds its own platform.
        DocumentParse nested(good.c_str(),
                             DocumentParse::Platform::AlreadyInitialized);
        EXPECT_NE(nested.Document(), nullptr);
        HostText text(ElementText(nested.Document(), "b"));
        EXPECT_STREQ(text.get(), "text");
    }
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start);
    for (const char *path :
         {static_cast<const char *>(nullptr), missing.c_str()}) {
        DocumentParse parse(path);
        EXPECT_EQ(parse.Document(), nullptr);
        // A parse that fails lets the platform go at once.
        EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start);
    }
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start);
    try {
        DocumentParse parse(good.c_str());
        throw std::runtime_error("reader failed");
    } catch (const std::runtime_error &) {
    }
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start);
}

TEST(DocumentParse, uses_what_the_parser_built_despite_errors) {
    rs2test::TempDir dir;
    // Ends before its root element is closed.
    std::string truncated = WriteFile(dir, "truncated.xml", "<a><b>x</b>");
    DocumentParse parse(truncated.c_str());
    ASSERT_NE(parse.Document(), nullptr);
    EXPECT_EQ(OrNull(ElementText(parse.Document(), "b")), "x");
}

// What the DOM gives as the text content of element, narrowed as the
// lookups narrow it.
std::string DomTextContent(const xercesc::DOMElement *element) {
    char *narrow = xercesc::XMLString::transcode(element->getTextContent());
    const std::string text = narrow != nullptr ? narrow : "<null>";
    xercesc::XMLString::release(&narrow);
    return text;
}

TEST(NodeText, gives_the_text_content_the_dom_gives) {
    // Elements of every shape: one text node, or text split by a comment,
    // CDATA, references, a child element; no content; text beyond ASCII.
    ParsedText parsed("<r><plain>1.5e+02</plain>"
                      "<spaced> a\tb\n </spaced>"
                      "<commented>x<!-- note -->y</commented>"
                      "<cdata><![CDATA[<raw>]]></cdata>"
                      "<references>a&amp;b&#233;</references>"
                      "<accented>Montr&#233;al</accented>"
                      "<ideograph>&#x5317;</ideograph>"
                      "<nested><i>in</i>ner</nested>"
                      "<empty></empty><onlyComment><!-- c --></onlyComment>"
                      "</r>");
    ASSERT_NE(parsed.Document(), nullptr);
    for (const char *tag :
         {"plain", "spaced", "commented", "cdata", "references", "accented",
          "ideograph", "nested", "empty", "onlyComment", "r"}) {
        const xercesc::DOMElement *element =
            FirstElementByTag(parsed.Document(), tag);
        ASSERT_NE(element, nullptr) << tag;
        const std::string expected = DomTextContent(element);
        EXPECT_EQ(NodeText(element), expected) << tag;
        EXPECT_EQ(OrNull(ElementText(parsed.Document(), tag)), expected) << tag;
    }
    EXPECT_EQ(NodeText(FirstElementByTag(parsed.Document(), "accented")),
              "Montr\xC3\xA9"
              "al");
    EXPECT_EQ(FirstElementByTag(parsed.Document(), "noSuchElement"), nullptr);
    EXPECT_EQ(FirstElementByTag(nullptr, "plain"), nullptr);
}

} // namespace
