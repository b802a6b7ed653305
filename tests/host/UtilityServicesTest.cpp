#include "host/ErrorReports.hpp"
#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "host/XmlUtil.hpp"
#include "tests/support/TempDir.hpp"

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <xercesc/dom/DOM.hpp>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/parsers/XercesDOMParser.hpp>
#include <xercesc/util/PlatformUtils.hpp>

namespace {

// Destroys whatever list it holds when the test ends, failed or not.
struct ListKeeper {
    char **list = nullptr;
    ~ListKeeper() { DestroyStringList(list); }
};

std::vector<std::string> Texts(char *const *list) {
    std::vector<std::string> texts;
    for (int i = 0; i < CountStringList(list); ++i)
        texts.emplace_back(list[i]);
    return texts;
}

char **ListOf(const std::vector<std::string> &texts) {
    char **list = nullptr;
    for (const std::string &text : texts)
        list = AddStringToList(list, text.c_str());
    return list;
}

} // namespace

TEST(TextServices, allocations_are_usable_for_any_size) {
    std::unique_ptr<void, decltype(&std::free)> empty(HMalloc(0), std::free);
    EXPECT_NE(empty.get(), nullptr);
    std::unique_ptr<int, decltype(&std::free)> zeroed(
        static_cast<int *>(HCalloc(16, sizeof(int))), std::free);
    ASSERT_NE(zeroed.get(), nullptr);
    for (int i = 0; i < 16; ++i)
        EXPECT_EQ(zeroed.get()[i], 0);
    std::unique_ptr<char, decltype(&std::free)> copy(HString(nullptr),
                                                     std::free);
    EXPECT_STREQ(copy.get(), "");
}

TEST(TextServices, mkname_formats_any_length_and_keeps_a_ring_of_texts) {
    std::vector<const char *> texts;
    for (int i = 0; i < kMkNameRingSize; ++i)
        texts.push_back(MkName("text %d", i));
    for (int i = 0; i < kMkNameRingSize; ++i)
        EXPECT_EQ(texts[i], "text " + std::to_string(i));
    std::string longText(100000, 'x');
    EXPECT_EQ(MkName("<%s>", longText.c_str()), "<" + longText + ">");
    EXPECT_STREQ(MkName("%.3lf;%d", 12.5, -3), "12.500;-3");
}

TEST(TextServices, lcasestring_lowers_ascii_letters_only) {
    struct Case {
        const char *input;
        const char *expected;
    } cases[] = {{"Sigma Nought", "sigma nought"},
                 {"CALIBRATION TYPE:", "calibration type:"},
                 {"\xC9T\xC9", "\xC9t\xC9"},
                 {"", ""}};
    for (const Case &c : cases) {
        std::string text = c.input;
        EXPECT_EQ(LCaseString(text.data()), text.data());
        EXPECT_EQ(text, c.expected) << c.input;
    }
}

TEST(StringLists, null_is_the_empty_list) {
    EXPECT_EQ(CountStringList(nullptr), 0);
    EXPECT_EQ(DuplicateStringList(nullptr), nullptr);
    EXPECT_EQ(AddStringList(nullptr, nullptr), nullptr);
    EXPECT_EQ(FetchAuxEntry(nullptr, "Key"), nullptr);
    EXPECT_EQ(DeleteAuxEntries(nullptr, "Key", nullptr, 1), nullptr);
    ListKeeper keeper;
    keeper.list = AddStringToList(nullptr, nullptr);
    EXPECT_EQ(Texts(keeper.list), std::vector<std::string>{""});
}

TEST(StringLists, lists_keep_deep_copies_of_their_texts) {
    char text[] = "one";
    ListKeeper original;
    original.list = AddStringToList(nullptr, text);
    original.list = AddStringToList(original.list, "two");
    text[0] = 'X';
    ListKeeper duplicate;
    duplicate.list = DuplicateStringList(original.list);
    ListKeeper appended;
    appended.list = AddStringList(ListOf({"zero"}), original.list);
    original.list[0][0] = 'Y';
    EXPECT_EQ(Texts(duplicate.list), (std::vector<std::string>{"one", "two"}));
    EXPECT_EQ(Texts(appended.list),
              (std::vector<std::string>{"zero", "one", "two"}));
    original.list = AddStringList(original.list, original.list);
    EXPECT_EQ(Texts(original.list),
              (std::vector<std::string>{"Yne", "two", "Yne", "two"}));
}

TEST(StringLists, set_aux_entry_replaces_the_first_entry_or_appends) {
    ListKeeper keeper;
    keeper.list = SetAuxEntry(nullptr, "BeamMode", "S3");
    keeper.list = AddStringToList(keeper.list, MakeAuxEntry("Row", "1"));
    keeper.list = AddStringToList(keeper.list, MakeAuxEntry("Row", "2"));
    keeper.list = SetAuxEntry(keeper.list, "Row", "9");
    keeper.list = SetAuxEntry(keeper.list, "ColumnCount", nullptr);
    // A value read from the entry being replaced must survive the swap.
    keeper.list = SetAuxEntry(keeper.list, "BeamMode",
                              FetchAuxEntry(keeper.list, "BeamMode"));
    EXPECT_EQ(Texts(keeper.list),
              (std::vector<std::string>{"BeamMode: S3", "Row: 9", "Row: 2",
                                        "ColumnCount: "}));
}

TEST(StringLists, fetch_aux_entry_matches_whole_keys_only) {
    ListKeeper keeper;
    keeper.list =
        ListOf({"RowCount: 5", "Rows:1", "Row: 7", "row: 8", "Col: "});
    struct Case {
        const char *key;
        const char *expected; // null: no entry
    } cases[] = {{"Row", "7"},    {"RowCount", "5"}, {"row", "8"},
                 {"Ro", nullptr}, {"ROW", nullptr},  {"Rows", nullptr},
                 {"Col", ""}};
    for (const Case &c : cases) {
        const char *value = FetchAuxEntry(keeper.list, c.key);
        if (c.expected == nullptr)
            EXPECT_EQ(value, nullptr) << c.key;
        else
            EXPECT_STREQ(value, c.expected) << c.key;
    }
    EXPECT_EQ(FetchAuxEntry(keeper.list, "Row"), keeper.list[2] + 5);
}

TEST(StringLists, delete_aux_entries_by_value_or_all) {
    ListKeeper keeper;
    keeper.list = ListOf({"a: 1", "ab: 1", "a: 3", "b: 2", "a: 1"});
    keeper.list = DeleteAuxEntries(keeper.list, "a", "1", 0);
    EXPECT_EQ(Texts(keeper.list),
              (std::vector<std::string>{"ab: 1", "a: 3", "b: 2"}));
    keeper.list = DeleteAuxEntries(keeper.list, "a", nullptr, 1);
    EXPECT_EQ(Texts(keeper.list), (std::vector<std::string>{"ab: 1", "b: 2"}));
}

TEST(StringLists, text_file_lines_lose_only_their_terminators) {
    rs2test::TempDir dir;
    struct Case {
        const char *what;
        std::string content;
        std::vector<std::string> lines;
    } cases[] = {
        {"LF", "a\nb\n", {"a", "b"}},
        {"CRLF", "a\r\n\r\nb\r\n", {"a", "", "b"}},
        {"no final newline", "a\nlast", {"a", "last"}},
        {"CR not before LF", "a\rb\nc\r", {"a\rb", "c\r"}},
        {"Latin-1 byte", "caf\xE9\n", {"caf\xE9"}},
        {"empty file", "", {}},
        {"a line of any length",
         std::string(200000, 'x') + "\ny",
         {std::string(200000, 'x'), "y"}},
        // Wide text, told by its byte-order mark or by its first '<'.
        {"UTF-16LE with mark",
         std::string("\xFF\xFE<\0a\0\r\0\n\0\xE9\0", 12),
         {"<a", "\xC3\xA9"}},
        {"UTF-16BE without mark",
         std::string("\0<\0?\0\n\xD8\x3D\xDE\x00", 10),
         {"<?", "\xF0\x9F\x98\x80"}},
        {"UTF-16 cut inside a pair",
         std::string("\xFE\xFF\0<\xD8\x3D", 6),
         {"<\xEF\xBF\xBD"}},
        {"UTF-32LE with mark",
         std::string("\xFF\xFE\0\0<\0\0\0\n\0\0\0\xE9\0\0\0", 16),
         {"<", "\xC3\xA9"}},
        {"UTF-32BE without mark",
         std::string("\0\0\0<\0\x11\0\0\0\0\0b", 12),
         {"<\xEF\xBF\xBD"
          "b"}},
    };
    for (const Case &c : cases) {
        std::string path = dir.File("lines.txt");
        std::ofstream(path, std::ios::binary) << c.content;
        ListKeeper keeper;
        keeper.list = TextFileToStringList(path.c_str());
        ASSERT_NE(keeper.list, nullptr) << c.what;
        EXPECT_EQ(Texts(keeper.list), c.lines) << c.what;
    }
    EXPECT_EQ(TextFileToStringList(dir.Path().c_str()), nullptr);
    EXPECT_EQ(TextFileToStringList(dir.File("missing").c_str()), nullptr);
}

TEST(StringLists, dkcheck_sees_regular_files_only) {
    rs2test::TempDir dir;
    std::ofstream(dir.File("present.xml")) << "x";
    std::filesystem::create_directory(dir.File("folder"));
    EXPECT_NE(DKCheck(dir.File("present.xml").c_str()), 0);
    EXPECT_EQ(DKCheck(dir.File("folder").c_str()), 0);
    EXPECT_EQ(DKCheck(dir.File("missing.xml").c_str()), 0);
    EXPECT_EQ(DKCheck(nullptr), 0);
}

TEST(ErrorReports, errors_and_severe_errors_throw_code_class_and_message) {
    host::ClearWarnings();
    std::string longName(5000, 'n');
    for (int32_t reportClass : {host::kError, host::kSevere}) {
        try {
            IMPError(11, reportClass, "invalid segment number %d of %s", 7,
                     longName.c_str());
            ADD_FAILURE() << "class " << reportClass << " returned";
        } catch (const host::ReportedError &error) {
            EXPECT_EQ(error.code, 11);
            EXPECT_EQ(error.reportClass, reportClass);
            EXPECT_EQ(error.what(), "invalid segment number 7 of " + longName);
        }
    }
    try {
        IMPErrChar(43, host::kError, "access", "rb");
        ADD_FAILURE() << "IMPErrChar returned";
    } catch (const host::ReportedError &error) {
        EXPECT_EQ(error.code, 43);
        EXPECT_STREQ(error.what(), "access: rb");
    }
    EXPECT_TRUE(host::Warnings().empty());
}

TEST(ErrorReports, warnings_are_logged_and_the_call_returns) {
    host::ClearWarnings();
    IMPError(-1, host::kWarning, "No %s table", "Sigma Nought");
    IMPErrChar(-1, host::kWarning, "missing", nullptr);
    EXPECT_EQ(
        host::Warnings(),
        (std::vector<std::string>{"No Sigma Nought table", "missing: (null)"}));
    host::ClearWarnings();
    EXPECT_TRUE(host::Warnings().empty());
}

namespace {

// Keeps one Initialize/Terminate pair open for the scope.
struct XmlPlatformPair {
    int result = ORV_XMLUtil::Initialize();
    ~XmlPlatformPair() {
        if (result != 0)
            ORV_XMLUtil::Terminate();
    }
};

bool PlatformIsUp() { return xercesc::XMLPlatformUtils::fgMemoryManager; }

// Parses xml and gives the text of the first element named tag.
std::string FirstText(const std::string &xml, const char *tag) {
    xercesc::MemBufInputSource source(
        reinterpret_cast<const XMLByte *>(xml.data()), xml.size(), "test");
    xercesc::XercesDOMParser parser;
    parser.parse(source);
    xercesc::DOMDocument *document = parser.getDocument();
    if (document == nullptr)
        return "<no document>";
    xercesc::DOMNodeList *nodes =
        document->getElementsByTagName(XmlTranscode(tag));
    if (nodes->getLength() == 0)
        return "<no element>";
    return XmlTranscode(nodes->item(0)->getTextContent()).Narrow();
}

const char *const kDocument = "<a><b>caf\xC3\xA9</b></a>";

} // namespace

TEST(XmlPlatform, nested_pairs_keep_the_platform_until_the_last_terminate) {
    ASSERT_EQ(ORV_XMLUtil::InitializeCount(), 0);
    {
        XmlPlatformPair outer;
        ASSERT_EQ(outer.result, 1);
        {
            XmlPlatformPair inner;
            EXPECT_EQ(inner.result, 1);
            EXPECT_EQ(ORV_XMLUtil::InitializeCount(), 2);
        }
        EXPECT_EQ(ORV_XMLUtil::InitializeCount(), 1);
        EXPECT_TRUE(PlatformIsUp());
        EXPECT_EQ(FirstText(kDocument, "b"), "caf\xC3\xA9");
    }
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), 0);
    EXPECT_FALSE(PlatformIsUp());
}

TEST(XmlPlatform, platform_works_again_after_cycles_and_a_lone_terminate) {
    for (int cycle = 0; cycle < 3; ++cycle) {
        XmlPlatformPair pair;
        ASSERT_EQ(pair.result, 1);
        EXPECT_EQ(FirstText(kDocument, "b"), "caf\xC3\xA9") << cycle;
    }
    EXPECT_FALSE(PlatformIsUp());
    ORV_XMLUtil::Terminate(); // unmatched: harmless
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), 0);
    XmlPlatformPair pair;
    ORV_XMLUtil::Initialize();
    ORV_XMLUtil::Terminate();
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), 1);
    EXPECT_EQ(FirstText(kDocument, "b"), "caf\xC3\xA9");
}

TEST(XmlTranscode, converts_utf8_to_utf16_and_back_without_the_platform) {
    ASSERT_EQ(ORV_XMLUtil::InitializeCount(), 0);
    struct Case {
        std::string narrow;
        std::u16string wide;
        std::string back; // narrow text made from wide
    } cases[] = {
        {"Sigma Nought", u"Sigma Nought", "Sigma Nought"},
        {"\xC3\xA9t\xC3\xA9 \xE2\x82\xAC", u"\u00E9t\u00E9 \u20AC",
         "\xC3\xA9t\xC3\xA9 \xE2\x82\xAC"},
        {"\xF0\x9F\x9B\xB0", u"\U0001F6F0", "\xF0\x9F\x9B\xB0"},
        // Malformed bytes become one U+FFFD each: a Latin-1 byte, an overlong
        // '/', an encoded surrogate, a sequence cut short.
        {"caf\xE9", u"caf\uFFFD", "caf\xEF\xBF\xBD"},
        {"\xC0\xAF", u"\uFFFD\uFFFD", "\xEF\xBF\xBD\xEF\xBF\xBD"},
        {"\xED\xA0\x80", u"\uFFFD\uFFFD\uFFFD",
         "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD"},
        {"x\xE2\x82", u"x\uFFFD\uFFFD", "x\xEF\xBF\xBD\xEF\xBF\xBD"},
    };
    for (const Case &c : cases) {
        XmlTranscode fromNarrow(c.narrow);
        EXPECT_EQ(std::u16string(fromNarrow.XmlText()), c.wide) << c.narrow;
        EXPECT_EQ(fromNarrow.Narrow(), c.narrow);
        EXPECT_EQ(XmlTranscode(c.wide.c_str()).Narrow(), c.back) << c.narrow;
    }
    const char16_t loneSurrogate[] = {0xD800, u'x', 0};
    EXPECT_EQ(XmlTranscode(loneSurrogate).Narrow(), "\xEF\xBF\xBDx");
    XmlTranscode none(static_cast<const char *>(nullptr));
    EXPECT_TRUE(none.Empty());
    EXPECT_EQ(none.XmlText()[0], 0);
}
