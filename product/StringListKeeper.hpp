#pragma once

#include "host/StringLists.hpp"

#include <cstdlib>
#include <memory>

/// Releases a host allocation (host texts come from the C heap).
struct HostFree {
    void operator()(void *memory) const { std::free(memory); }
};
/// A host text owned from the line that receives it.
using HostText = std::unique_ptr<char, HostFree>;

/// Owns a host key/value list while it is being built. Every changing host
/// call may move the list, so the keeper always holds the pointer the last
/// call returned; a host call that throws leaves the previous list intact,
/// and the keeper destroys it.
class StringListKeeper {
  public:
    StringListKeeper() = default;
    explicit StringListKeeper(char **listIn) : list(listIn) {}
    ~StringListKeeper() { DestroyStringList(list); }
    StringListKeeper(const StringListKeeper &) = delete;
    StringListKeeper &operator=(const StringListKeeper &) = delete;

    /// The list as it stands (null while it holds nothing); still owned here.
    char **Get() const { return list; }
    /// Takes listIn in place of the list held so far, which is destroyed.
    void Reset(char **listIn) {
        if (listIn != list)
            DestroyStringList(list);
        list = listIn;
    }
    /// Hands the list over; the caller destroys it with DestroyStringList.
    char **Release() {
        char **out = list;
        list = nullptr;
        return out;
    }

    /// Value of the first entry of key (pointing into the list), or null.
    const char *Fetch(const char *key) const {
        return FetchAuxEntry(list, key);
    }
    void Set(const char *key, const char *value) {
        list = SetAuxEntry(list, key, value);
    }
    /// Removes every entry of key.
    void Delete(const char *key) {
        list = DeleteAuxEntries(list, key, nullptr, 1);
    }
    /// Appends copies of the texts of other.
    void Append(char *const *other) { list = AddStringList(list, other); }

  private:
    char **list = nullptr;
};
