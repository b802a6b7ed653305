#include "host/TextServices.hpp"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

// MkName results stay valid for the next kMkNameRingSize - 1 calls, so that a
// caller may hold a handful of them at once (for example while building one
// entry out of several formatted parts). Each thread has its own ring, so one
// thread's formatting never overwrites a text another thread still reads.
struct MkNameRing {
    std::array<std::string, kMkNameRingSize> buffers;
    std::size_t next = 0;

    std::string &NextBuffer() {
        std::string &buffer = buffers[next];
        next = (next + 1) % buffers.size();
        return buffer;
    }
};

thread_local MkNameRing mkNameRing;

} // namespace

void *HMalloc(std::size_t bytes) {
    // A zero-byte request still gives a distinct pointer the caller can free,
    // so callers never mistake an empty allocation for a failure.
    return std::malloc(bytes == 0 ? 1 : bytes);
}

void *HCalloc(std::size_t count, std::size_t size) {
    if (count == 0 || size == 0)
        return std::calloc(1, 1);
    return std::calloc(count, size);
}

char *HString(const char *text) {
    const char *source = text != nullptr ? text : "";
    std::size_t bytes = std::strlen(source) + 1;
    char *copy = static_cast<char *>(HMalloc(bytes));
    if (copy != nullptr)
        std::memcpy(copy, source, bytes);
    return copy;
}

std::string FormatTextV(const char *format, std::va_list args) {
    if (format == nullptr)
        return std::string();
    // The first pass only measures, so the second can write any length.
    std::va_list measureArgs;
    va_copy(measureArgs, args);
    int length = std::vsnprintf(nullptr, 0, format, measureArgs);
    va_end(measureArgs);
    if (length <= 0)
        return std::string();
    std::string text(static_cast<std::size_t>(length), '\0');
    std::vsnprintf(text.data(), text.size() + 1, format, args);
    return text;
}

const char *MkName(const char *format, ...) {
    std::string &buffer = mkNameRing.NextBuffer();
    std::va_list args;
    va_start(args, format);
    buffer = FormatTextV(format, args);
    va_end(args);
    return buffer.c_str();
}

char *LCaseString(char *text) {
    if (text == nullptr)
        return nullptr;
    // ASCII only: the result must not depend on the process's locale.
    for (char *c = text; *c != '\0'; ++c) {
        if (*c >= 'A' && *c <= 'Z')
            *c = static_cast<char>(*c - 'A' + 'a');
    }
    return text;
}

const char *_(const char *text) { return text; }
