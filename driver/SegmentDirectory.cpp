#include "driver/SegmentDirectory.hpp"

#include "driver/DatasetNames.hpp"
#include "host/ErrorReports.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"

#include <cstring>
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
// segment. One list serves every cursor of every dataset: it is filled by the
// first read that finds it empty and dropped when a cursor reaches its end.
char **textLineCache = nullptr;
int32_t textLineCount = 0; // number of lines in textLineCache

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
    const char *name = fp2filename(cursor->handle);
    if (textLineCache == nullptr) {
        orv::core::fileio::File file = ParseFileName(name ? name : "");
        textLineCache =
            TextFileToStringList(file.GetNormalizedName().c_str());
        if (textLineCache == nullptr)
            return 0;
        textLineCount = CountStringList(textLineCache);
    }
    // A cursor whose index lies past the end of the list (another dataset's
    // shorter description, or a negative index) has reached its end.
    if (cursor->lineIndex < 0 || cursor->lineIndex >= textLineCount) {
        DestroyStringList(textLineCache);
        textLineCache = nullptr;
        return 0;
    }
    if (length <= 0)
        return 0;
    std::strncpy(buffer, textLineCache[cursor->lineIndex], length);
    buffer[length - 1] = '\0';
    ++cursor->lineIndex;
    return 1;
}
