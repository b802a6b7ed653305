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
// is only part of the key; such keys are looked up the host's way.
bool IsIndexable(const char *key) {
    return std::strstr(key, kSeparator) == nullptr;
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
    if (key == nullptr || !IsIndexable(key))
        return FetchAuxEntry(list, key);
    const auto at = FirstEntry(key);
    return at ? list[*at] + std::strlen(key) + std::strlen(kSeparator)
              : nullptr;
}

void StringListKeeper::Set(const char *key, const char *value) {
    if (key == nullptr)
        return;
    if (!IsIndexable(key)) {
        const std::size_t before = count;
        list = SetAuxEntry(list, key, value);
        Recount();
        // An appending host call leaves an array of exactly the texts.
        if (count != before)
            capacity = count + 1;
        return;
    }
    // Copied before anything is freed: value may point into the entry that
    // is replaced.
    HostText entry = CopyOf(MakeAuxEntry(key, value));
    if (const auto at = FirstEntry(key)) {
        std::free(list[*at]);
        list[*at] = entry.release();
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
    IndexNewEntries();
    const auto found = firstEntries.find(key);
    if (found == firstEntries.end())
        return std::nullopt;
    return found->second;
}

void StringListKeeper::IndexNewEntries() const {
    for (; indexed < count; ++indexed) {
        const char *text = list[indexed];
        const char *separator = std::strstr(text, kSeparator);
        if (separator != nullptr)
            firstEntries.emplace(std::string(text, separator), indexed);
    }
}

void StringListKeeper::ForgetIndex() {
    firstEntries.clear();
    indexed = 0;
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
