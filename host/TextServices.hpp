#pragma once

#include <cstdarg>
#include <cstddef>
#include <string>

// Memory and text services of the host. Everything allocated here comes from
// the C heap, so the driver releases it with free().

/// malloc() that never returns null for a zero size; the caller frees with
/// free().
void *HMalloc(std::size_t bytes);
/// calloc(); the caller frees with free().
void *HCalloc(std::size_t count, std::size_t size);
/// A malloc'ed copy of text (an empty copy for null); the caller frees with
/// free().
char *HString(const char *text);
/// printf-style formatting into a host-owned ring of buffers. The text stays
/// valid until MkName has been called kMkNameRingSize more times; callers never
/// free it.
const char *MkName(const char *format, ...)
    __attribute__((format(printf, 1, 2)));
/// Number of MkName results that are alive at once.
constexpr int kMkNameRingSize = 64;
/// printf-style formatting of any length into a std::string; the formatting
/// core of MkName and of the error reports. A null format gives "".
std::string FormatTextV(const char *format, std::va_list args)
    __attribute__((format(printf, 1, 0)));
/// Lower-cases text in place (ASCII letters) and returns it.
char *LCaseString(char *text);
/// The message text to report. No translation catalogue ships, so this is the
/// text itself.
const char *_(const char *text);
