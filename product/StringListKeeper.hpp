#pragma once

#include "host/HostMemory.hpp"
#include "host/StringLists.hpp"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <set>
#include <string>
#include <unordered_map>

using host::HostText;

/// Owns a host key/value list while it is being built, with the host's
/// meaning of every call (Set replaces the first entry of a key, or appends).
/// A host call that throws leaves the list as it was, and the keeper
/// destroys it.
///
/// A product's metadata is built entry by entry from documents of any size;
/// the keeper finds the first entry of a key through an index and grows the
/// array by doubling, so that building n entries costs O(n), not the O(n^2)
/// of searching and reallocating the host list on every call. Keys that hold
/// ": " themselves (a side file may have them) are found through a second
/// index, built only once such a key is asked for.
class StringListKeeper {
  public:
    StringListKeeper() = default;
    explicit StringListKeeper(char **listIn) { Reset(listIn); }
    ~StringListKeeper() { DestroyStringList(list); }
    StringListKeeper(const StringListKeeper &) = delete;
    StringListKeeper &operator=(const StringListKeeper &) = delete;

    /// The list as it stands (null while it holds nothing); still owned here.
    char **Get() const { return list; }
    /// Takes listIn in place of the list held so far, which is destroyed.
    void Reset(char **listIn);
    /// Hands the list over; the caller destroys it with DestroyStringList.
    char **Release();

    /// Value of the first entry of key (pointing into the list), or null.
    const char *Fetch(const char *key) const;
    void Set(const char *key, const char *value);
    /// Removes every entry of key.
    void Delete(const char *key);
    /// Appends copies of the texts of other.
    void Append(char *const *other);

  private:
    std::optional<std::size_t> FirstEntry(const std::string &key) const;
    std::optional<std::size_t> FirstPrefixed(const std::string &key) const;
    void IndexNewEntries() const;
    void IndexNewPrefixes() const;
    void IndexPrefixes(std::size_t entry, bool add) const;
    void ForgetPrefix(std::uint64_t hash, std::size_t entry) const;
    void Replace(std::size_t entry, HostText text);
    void ForgetIndex();
    void Recount();
    void MakeRoom(std::size_t texts);

    char **list = nullptr;
    std::size_t count = 0;    // texts in the list
    std::size_t capacity = 0; // slots the array has, the terminator's included
    // The first entry of every key that holds no ": ", for the entries
    // [0, indexed); the rest are indexed when a key is next looked up.
    mutable std::unordered_map<std::string, std::size_t> firstEntries;
    mutable std::size_t indexed = 0;
    // For the entries [0, prefixIndexed): the text before every ": " of an
    // entry, by its hash, gives the entries that begin with that text. A key
    // matches an entry when the entry begins with the key and ": ", so the
    // entries whose such text hashes like the key are the candidates.
    mutable std::unordered_map<std::uint64_t, std::set<std::size_t>>
        prefixEntries;
    mutable std::size_t prefixIndexed = 0;
};
