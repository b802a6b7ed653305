#include "product/StringListKeeper.hpp"

#include "host/TextServices.hpp"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <new>
#include <vector>

namespace {

constexpr const char *kSeparator = ": ";

// A key holding ": " can match entries whose text before their first ": "
// is only part of the key; such keys are looked up by every ": " of the
// entries.
bool IsIndexable(const char *key) {
    return std::strstr(key, kSeparator) == nullptr;
}

// FNV-1a, extended one byte at a time, so that the texts before every ": "
// of an entry are hashed in one pass over it.
constexpr std::uint64_t kHashStart = 14695981039346656037ull;
std::uint64_t HashStep(std::uint64_t hash, char c) {
    return (hash ^ static_cast<unsigned char>(c)) * 1099511628211ull;
}
std::uint64_t HashOf(const std::string &text) {
    std::uint64_t hash = kHashStart;
    for (char c : text)
        hash = HashStep(hash, c);
    return hash;
}

bool BeginsWithKey(const char *text, const std::string &key) {
    return std::strncmp(text, key.c_str(), key.size()) == 0 &&
           std::strncmp(text + key.size(), kSeparator, 2) == 0;
}

HostText CopyOf(const char *text) {
    HostText copy(HString(text));
    if (copy == nullptr)
        throw std::bad_alloc();
    return copy;
}

} // namespace

void StringListKeeper::Reset(char **listIn) {
    if (listIn != list)
        DestroyStringList(list);
    list = listIn;
    ForgetIndex();
    Recount();
    capacity = list != nullptr ? count + 1 : 0;
}

char **StringListKeeper::Release() {
    char **out = list;
    list = nullptr;
    count = capacity = 0;
    ForgetIndex();
    return out;
}

const char *StringListKeeper::Fetch(const char *key) const {
    if (key == nullptr)
        return nullptr;
    const auto at = FirstEntry(key);
    return at ? list[*at] + std::strlen(key) + std::strlen(kSeparator)
              : nullptr;
}

void StringListKeeper::Set(const char *key, const char *value) {
    if (key == nullptr)
        return;
    // Copied before anything is freed: value may point into the entry that
    // is replaced.
    HostText entry = CopyOf(MakeAuxEntry(key, value));
    if (const auto at = FirstEntry(key)) {
        Replace(*at, std::move(entry));
        return;
    }
    MakeRoom(1);
    list[count++] = entry.release();
    list[count] = nullptr;
}

void StringListKeeper::Delete(const char *key) {
    list = DeleteAuxEntries(list, key, nullptr, 1);
    Recount();
    ForgetIndex();
}

void StringListKeeper::Append(char *const *other) {
    // Copies first: other may be this very list.
    std::vector<HostText> copies;
    for (char *const *text = other; text != nullptr && *text != nullptr; ++text)
        copies.push_back(CopyOf(*text));
    if (copies.empty())
        return;
    MakeRoom(copies.size());
    for (HostText &copy : copies)
        list[count++] = copy.release();
    list[count] = nullptr;
}

std::optional<std::size_t>
StringListKeeper::FirstEntry(const std::string &key) const {
    if (!IsIndexable(key.c_str()))
        return FirstPrefixed(key);
    IndexNewEntries();
    const auto found = firstEntries.find(key);
    if (found == firstEntries.end())
        return std::nullopt;
    return found->second;
}

std::optional<std::size_t>
StringListKeeper::FirstPrefixed(const std::string &key) const {
    IndexNewPrefixes();
    const auto found = prefixEntries.find(HashOf(key));
    if (found == prefixEntries.end())
        return std::nullopt;
    // Texts that only share the key's hash are passed over.
    for (const std::size_t entry : found->second)
        if (BeginsWithKey(list[entry], key))
            return entry;
    return std::nullopt;
}

void StringListKeeper::IndexNewEntries() const {
    for (; indexed < count; ++indexed) {
        const char *text = list[indexed];
        const char *separator = std::strstr(text, kSeparator);
        if (separator != nullptr)
            firstEntries.emplace(std::string(text, separator), indexed);
    }
}

// Nothing is indexed this way until a key holding ": " is first asked for.
void StringListKeeper::IndexNewPrefixes() const {
    for (; prefixIndexed < count; ++prefixIndexed)
        IndexPrefixes(prefixIndexed, true);
}

void StringListKeeper::IndexPrefixes(std::size_t entry, bool add) const {
    std::uint64_t hash = kHashStart;
    for (const char *c = list[entry]; *c != '\0'; ++c) {
        if (c[0] == ':' && c[1] == ' ') {
            if (add)
                prefixEntries[hash].insert(entry);
            else
                ForgetPrefix(hash, entry);
        }
        hash = HashStep(hash, *c);
    }
}

void StringListKeeper::ForgetPrefix(std::uint64_t hash,
                                    std::size_t entry) const {
    const auto found = prefixEntries.find(hash);
    if (found == prefixEntries.end())
        return;
    found->second.erase(entry);
    if (found->second.empty())
        prefixEntries.erase(found);
}

// The entry's text before its key's ": " stays the same; what follows may
// hold other ": ", so the second index, where it covers the entry, is
// brought up to date.
void StringListKeeper::Replace(std::size_t entry, HostText text) {
    const bool prefixesIndexed = entry < prefixIndexed;
    if (prefixesIndexed)
        IndexPrefixes(entry, false);
    std::free(list[entry]);
    list[entry] = text.release();
    if (prefixesIndexed)
        IndexPrefixes(entry, true);
}

void StringListKeeper::ForgetIndex() {
    firstEntries.clear();
    indexed = 0;
    prefixEntries.clear();
    prefixIndexed = 0;
}

void StringListKeeper::Recount() {
    count = static_cast<std::size_t>(CountStringList(list));
}

// Room for `texts` more texts and the terminator, the array at least doubled
// when it grows. The host allocates lists with the C allocator, so the array
// is grown in place of the host.
void StringListKeeper::MakeRoom(std::size_t texts) {
    const std::size_t needed = count + texts + 1;
    if (needed <= capacity)
        return;
    const std::size_t slots = std::max({needed, capacity * 2, std::size_t{16}});
    auto *grown =
        static_cast<char **>(std::realloc(list, slots * sizeof(char *)));
    if (grown == nullptr)
        throw std::bad_alloc();
    list = grown;
    capacity = slots;
}
