#pragma once

#include <cstddef>
#include <cstdlib>
#include <memory>
#include <strings.h>

// Small helpers the readers of the product description share.

struct HostStringDeleter {
    void operator()(char *text) const { std::free(text); }
};
/// Owner of a host string (released with free()).
using HostString = std::unique_ptr<char, HostStringDeleter>;

/// A name of the product description and the code it stands for.
template <class Code> struct CodeName {
    const char *name;
    Code code;
};

/// The code whose name equals text as a whole, ignoring case; fallback for
/// any other text and for null.
template <class Code, std::size_t N>
Code CodeFromName(const char *text, const CodeName<Code> (&names)[N],
                  Code fallback) {
    if (text == nullptr)
        return fallback;
    for (const CodeName<Code> &entry : names)
        if (strcasecmp(text, entry.name) == 0)
            return entry.code;
    return fallback;
}
