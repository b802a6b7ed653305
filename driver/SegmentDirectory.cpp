#include "driver/SegmentDirectory.hpp"

#include "driver/DatasetNames.hpp"
#include "host/ErrorReports.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"

#include <cstddef>
#include <cstring>
#include <string>
#include <strings.h>

namespace {

constexpr int32_t kErrAccess = 43;

struct SegmentDescription {
    int32_t type;
    const char *text;
};

// The five segments every dataset offers, each numbered 1.
constexpr SegmentDescription kSegments[] = {
    {140, "Main product annotation"},
    {160, "Orbit segment"},
    {180, "RFMODEL:Rational Functions Model Segment"},
    {181, "Incidence Angle Array"},
    {214, "Ground control points"},
};

const char *SegmentText(int32_t type) {
    for (const SegmentDescription &segment : kSegments)
        if (segment.type == type)
            return segment.text;
    return nullptr;
}

// The lines of the product description being read as the annotation
// segment, and the dataset they belong to. One list serves every cursor: it
// is filled by a read that finds it empty or holding another dataset's
// lines, and dropped when a cursor reaches its end. The dataset is known by
// its handle and name together, so that a handle the host hands out again
// for another dataset does not find the lines of the closed one.
struct TextLineCache {
    char **lines = nullptr;
    int32_t count = 0; // number of entries of lines
    FILE *handle = nullptr;
    std::string name;

    bool Holds(FILE *handleIn, const std::string &nameIn) const {
        return lines != nullptr && handle == handleIn && name == nameIn;
    }
    void Drop() {
        DestroyStringList(lines);
        lines = nullptr;
        count = 0;
        handle = nullptr;
        name.clear();
    }
    // Reads the product description of the dataset; false when it cannot
    // be turned into lines, and the cache is then empty.
    bool Load(FILE *handleIn, const std::string &nameIn) {
        Drop();
        orv::core::fileio::File file = ParseFileName(nameIn.c_str());
        lines = TextFileToStringList(file.GetNormalizedName().c_str());
        if (lines == nullptr)
            return false;
        count = CountStringList(lines);
        handle = handleIn;
        name = nameIn;
        return true;
    }
};

TextLineCache &TextLines() {
    static TextLineCache cache;
    return cache;
}

} // namespace

int32_t FindSegmentNumber(int32_t segmentType, int32_t previous) {
    if (previous >= 1)
        return -1;
    return SegmentText(segmentType) != nullptr ? 1 : -1;
}

void DescribeSegmentObject(int32_t objectType, int32_t, char *buffer) {
    if (const char *text = SegmentText(objectType))
        std::strcpy(buffer, text);
}

int32_t OpenTextSegment(FILE *handle, TextCursor *cursor, const char *access,
                        int32_t value) {
    if (access == nullptr || strcasecmp(access, "r") != 0)
        IMPErrChar(kErrAccess, 0, "access", access);
    cursor->status = 0;
    cursor->handle = handle;
    cursor->value = value;
    cursor->position = 0;
    cursor->lineIndex = 0;
    return 0;
}

int32_t ReadTextLine(TextCursor *cursor, char *buffer, int32_t length) {
    // A buffer without room receives nothing, not even a terminating zero.
    if (length <= 0)
        return 0;
    const char *known = fp2filename(cursor->handle);
    const std::string name = known != nullptr ? known : "";
    TextLineCache &cache = TextLines();
    if (!cache.Holds(cursor->handle, name) && !cache.Load(cursor->handle, name))
        return 0;
    // A cursor whose index lies past the end of the list (or is negative)
    // has reached its end.
    if (cursor->lineIndex < 0 || cursor->lineIndex >= cache.count) {
        cache.Drop();
        return 0;
    }
    std::strncpy(buffer, cache.lines[cursor->lineIndex],
                 static_cast<std::size_t>(length));
    buffer[length - 1] = '\0';
    ++cursor->lineIndex;
    return 1;
}
