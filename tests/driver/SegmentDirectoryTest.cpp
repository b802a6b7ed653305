#include "driver/SegmentDirectory.hpp"

#include "driver/DatasetLifecycle.hpp"
#include "driver/OperationTable.hpp"
#include "host/ErrorReports.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <cstring>
#include <fstream>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace {

struct DatasetCloser {
    void operator()(FILE *handle) const { CloseDataset(handle); }
};
using DatasetKeeper = std::unique_ptr<FILE, DatasetCloser>;

// A handle the driver never opened.
FILE *const kUnknownHandle = reinterpret_cast<FILE *>(0x1234);

// The lines of a text file, read here without the host's help.
std::vector<std::string> FileLines(const std::string &path) {
    std::ifstream in(path);
    std::vector<std::string> lines;
    for (std::string line; std::getline(in, line);)
        lines.push_back(line);
    return lines;
}

void WriteLines(const std::string &path,
                const std::vector<std::string> &lines) {
    std::ofstream out(path);
    for (const std::string &line : lines)
        out << line << '\n';
}

// A generated product opened as a dataset, with the lines of its
// description as they are on disk.
struct OpenProduct {
    explicit OpenProduct(const rs2gen::ProductOptions &options)
        : product(rs2gen::GenerateProduct(folder.Path(), options)),
          handle(OpenDataset(product.productXml.c_str(), "r")),
          lines(FileLines(product.productXml)) {}

    rs2test::TempDir folder;
    rs2gen::GeneratedProduct product;
    DatasetKeeper handle;
    std::vector<std::string> lines;
};

rs2gen::ProductOptions Product(const char *type, int tiePoints) {
    rs2gen::ProductOptions options;
    options.productType = type;
    options.width = 16;
    options.height = 12;
    options.tieGridColumns = tiePoints;
    options.tieGridRows = tiePoints;
    return options;
}

TextCursor OpenCursor(FILE *handle) {
    TextCursor cursor;
    std::memset(&cursor, 0x5A, sizeof cursor);
    EXPECT_EQ(OpenTextSegment(handle, &cursor, "R", 7), 0);
    return cursor;
}

// The next line of a cursor, or nothing at the end.
std::optional<std::string> NextLine(TextCursor &cursor) {
    std::vector<char> buffer(4096, 'A');
    if (ReadTextLine(&cursor, buffer.data(),
                     static_cast<int32_t>(buffer.size())) != 1)
        return std::nullopt;
    return std::string(buffer.data());
}

std::vector<std::string> AllLines(TextCursor &cursor) {
    std::vector<std::string> lines;
    while (std::optional<std::string> line = NextLine(cursor))
        lines.push_back(*line);
    return lines;
}

} // namespace

TEST(TextSegment, open_sets_up_the_cursor_and_refuses_other_access) {
    TextCursor cursor;
    std::memset(&cursor, 0x5A, sizeof cursor);
    const int64_t hostData = cursor.hostData;
    EXPECT_EQ(OpenTextSegment(kUnknownHandle, &cursor, "r", 42), 0);
    EXPECT_EQ(cursor.handle, kUnknownHandle);
    EXPECT_EQ(cursor.value, 42);
    EXPECT_EQ(cursor.status, 0);
    EXPECT_EQ(cursor.position, 0);
    EXPECT_EQ(cursor.lineIndex, 0);
    EXPECT_EQ(cursor.hostData, hostData);
    for (const char *access : {"w", "rw", ""}) {
        try {
            OpenTextSegment(kUnknownHandle, &cursor, access, 0);
            ADD_FAILURE() << "access " << access << " accepted";
        } catch (const host::ReportedError &error) {
            EXPECT_EQ(error.code, 43) << access;
        }
    }
}

TEST(TextSegment, cuts_a_line_at_the_buffer_length_and_zero_fills_the_rest) {
    OpenProduct open(Product("SGF", 2));
    ASSERT_NE(open.handle, nullptr);
    // A second line of exactly 30 characters.
    const std::string thirty = "<!--" + std::string(23, 'x') + "-->";
    ASSERT_EQ(thirty.size(), 30u);
    open.lines.insert(open.lines.begin() + 1, thirty);
    WriteLines(open.product.productXml, open.lines);

    struct Case {
        int32_t length;
        std::string written; // then a zero, then zeros up to length
    } cases[] = {
        {1, ""},
        {10, thirty.substr(0, 9)},
        {30, thirty.substr(0, 29)},
        {31, thirty},
        {40, thirty},
    };
    for (const Case &c : cases) {
        TextCursor cursor = OpenCursor(open.handle.get());
        ASSERT_EQ(NextLine(cursor), open.lines[0]);
        std::vector<char> buffer(64, 'A');
        ASSERT_EQ(ReadTextLine(&cursor, buffer.data(), c.length), 1);
        const auto length = static_cast<size_t>(c.length);
        EXPECT_EQ(std::string(buffer.data()), c.written) << c.length;
        EXPECT_EQ(std::string(buffer.data() + c.written.size(),
                              length - c.written.size()),
                  std::string(length - c.written.size(), '\0'))
            << c.length;
        EXPECT_EQ(std::string(buffer.data() + length, buffer.size() - length),
                  std::string(buffer.size() - length, 'A'))
            << c.length;
        EXPECT_EQ(cursor.lineIndex, 2);
        AllLines(cursor); // to the end, so the next case starts afresh
    }
}

TEST(TextSegment, buffer_without_room_gets_nothing) {
    OpenProduct open(Product("SGF", 2));
    ASSERT_NE(open.handle, nullptr);
    TextCursor cursor = OpenCursor(open.handle.get());
    for (int32_t length : {0, -1, -4096}) {
        char buffer[4] = {'A', 'A', 'A', 'A'};
        EXPECT_EQ(ReadTextLine(&cursor, buffer, length), 0) << length;
        EXPECT_EQ(std::string(buffer, 4), "AAAA") << length;
        EXPECT_EQ(cursor.lineIndex, 0) << length;
    }
    EXPECT_EQ(AllLines(cursor), open.lines);
}

TEST(TextSegment, gives_every_line_then_the_end_and_reloads_afterwards) {
    OpenProduct open(Product("SGF", 2));
    ASSERT_NE(open.handle, nullptr);
    ASSERT_GT(open.lines.size(), 10u);
    TextCursor cursor = OpenCursor(open.handle.get());
    EXPECT_EQ(AllLines(cursor), open.lines);
    const int32_t end = cursor.lineIndex;
    EXPECT_EQ(end, static_cast<int32_t>(open.lines.size()));
    // The index is not reset: the next call reloads and is at the end again.
    EXPECT_EQ(NextLine(cursor), std::nullopt);
    EXPECT_EQ(cursor.lineIndex, end);

    // The lines were dropped at the end: a changed file is read anew.
    open.lines.push_back("<!-- appended -->");
    WriteLines(open.product.productXml, open.lines);
    EXPECT_EQ(NextLine(cursor), "<!-- appended -->");
    TextCursor fresh = OpenCursor(open.handle.get());
    EXPECT_EQ(AllLines(fresh), open.lines);
}

TEST(TextSegment, cursors_of_two_datasets_each_get_their_own_lines) {
    OpenProduct first(Product("SGF", 2));
    OpenProduct second(Product("SLC", 5));
    ASSERT_NE(first.handle, nullptr);
    ASSERT_NE(second.handle, nullptr);
    ASSERT_NE(first.lines.size(), second.lines.size());

    // Line by line in turn, until both are at their end.
    TextCursor a = OpenCursor(first.handle.get());
    TextCursor b = OpenCursor(second.handle.get());
    std::vector<std::string> fromFirst, fromSecond;
    auto take = [](TextCursor &cursor, std::vector<std::string> &lines) {
        std::optional<std::string> line = NextLine(cursor);
        if (line)
            lines.push_back(*line);
        return line.has_value();
    };
    for (bool moreA = true, moreB = true; moreA || moreB;) {
        moreA = moreA && take(a, fromFirst);
        moreB = moreB && take(b, fromSecond);
    }
    EXPECT_EQ(fromFirst, first.lines);
    EXPECT_EQ(fromSecond, second.lines);

    // A read abandoned half-way leaves its lines behind; a cursor of the
    // other dataset does not get them.
    TextCursor abandoned = OpenCursor(first.handle.get());
    for (int i = 0; i < 3; ++i)
        ASSERT_TRUE(NextLine(abandoned));
    TextCursor other = OpenCursor(second.handle.get());
    EXPECT_EQ(AllLines(other), second.lines);
    EXPECT_EQ(NextLine(abandoned), first.lines[3]);
}

TEST(SegmentDirectory, offers_five_segments_numbered_one_to_open_datasets) {
    OpenProduct open(Product("SGF", 2));
    ASSERT_NE(open.handle, nullptr);
    DriverTable table{};
    FillOperationTable(&table);
    struct Case {
        FILE *handle;
        int32_t type, previous, number;
    } cases[] = {
        {open.handle.get(), 140, 0, 1},  {open.handle.get(), 160, 0, 1},
        {open.handle.get(), 180, 0, 1},  {open.handle.get(), 181, 0, 1},
        {open.handle.get(), 214, 0, 1},  {open.handle.get(), 214, 1, -1},
        {open.handle.get(), 140, 5, -1}, {open.handle.get(), 2, 0, -1},
        {open.handle.get(), 1, 0, -1},   {kUnknownHandle, 214, 0, -1},
        {kUnknownHandle, 140, 0, -1},
    };
    for (const Case &c : cases)
        EXPECT_EQ(table.FindSegment(c.handle, c.type, c.previous), c.number)
            << c.type << " after " << c.previous;
}

TEST(SegmentDirectory, describes_segments_for_any_handle_and_datasets_known) {
    OpenProduct open(Product("SGF", 2));
    ASSERT_NE(open.handle, nullptr);
    DriverTable table{};
    FillOperationTable(&table);
    const std::string untouched(81, '#');
    struct Case {
        FILE *handle;
        int32_t mode, type;
        const char *text; // null: the buffer stays untouched
    } cases[] = {
        {open.handle.get(), 0, 140, "Main product annotation"},
        {open.handle.get(), 0, 160, "Orbit segment"},
        {kUnknownHandle, 0, 180, "RFMODEL:Rational Functions Model Segment"},
        {kUnknownHandle, 0, 181, "Incidence Angle Array"},
        {kUnknownHandle, 0, 214, "Ground control points"},
        {kUnknownHandle, 0, 1, nullptr},
        {open.handle.get(), 1, 140, nullptr},
        {open.handle.get(), 0, 2, nullptr},
        {open.handle.get(), 0, 999, nullptr},
    };
    for (const Case &c : cases) {
        std::string buffer = untouched;
        table.DescribeObject(c.handle, c.mode, c.type, 1, buffer.data());
        if (c.text == nullptr) {
            EXPECT_EQ(buffer, untouched) << c.type;
        } else {
            EXPECT_STREQ(buffer.c_str(), c.text) << c.type;
        }
    }

    // The dataset itself: its product type entry.
    std::string buffer = untouched;
    table.DescribeObject(open.handle.get(), 0, 1, 0, buffer.data());
    EXPECT_STREQ(buffer.c_str(), "ProductType: SGF");
}
