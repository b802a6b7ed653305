#pragma once

#include "host/StringLists.hpp"

#include <cstdlib>
#include <memory>

// Owners for what the host hands out: texts and memory from the C heap
// (released with free()) and string lists (released with DestroyStringList).

namespace host {

struct FreeDeleter {
    void operator()(void *memory) const { std::free(memory); }
};
/// A host text or host allocation, owned from the line that receives it.
using HostText = std::unique_ptr<char, FreeDeleter>;

struct StringListDeleter {
    void operator()(char **list) const { DestroyStringList(list); }
};
/// A finished host string list.
using HostList = std::unique_ptr<char *, StringListDeleter>;

} // namespace host
