#include "host/StringLists.hpp"
#include "host/HostMemory.hpp"

#include "host/TextServices.hpp"
#include "host/XmlUtil.hpp"

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <memory>
#include <new>
#include <string>
#include <string_view>
#include <vector>

#include <sys/stat.h>

namespace {

using host::FreeDeleter;
using host::HostList;

using OwnedText = std::unique_ptr<char, FreeDeleter>;

const char *TextOrEmpty(const char *text) {
    return text != nullptr ? text : "";
}

// Appends copies of count texts. The copies are made before the array grows,
// so texts that live in list itself (a list appended to itself) stay readable.
char **AppendCopies(char **list, const char *const *texts, int count) {
    if (count <= 0)
        return list;
    std::vector<OwnedText> copies;
    copies.reserve(static_cast<std::size_t>(count));
    for (int i = 0; i < count; ++i) {
        copies.emplace_back(HString(texts[i]));
        if (!copies.back())
            throw std::bad_alloc();
    }
    int oldCount = CountStringList(list);
    std::size_t slots = static_cast<std::size_t>(oldCount) + copies.size() + 1;
    auto *grown =
        static_cast<char **>(std::realloc(list, slots * sizeof(char *)));
    if (grown == nullptr)
        throw std::bad_alloc();
    for (std::size_t i = 0; i < copies.size(); ++i)
        grown[oldCount + i] = copies[i].release();
    grown[slots - 1] = nullptr;
    return grown;
}

// The value of entry when it is an entry of key, otherwise null.
const char *EntryValue(const char *entry, const char *key) {
    std::size_t keyLength = std::strlen(key);
    if (std::strncmp(entry, key, keyLength) != 0 ||
        std::strncmp(entry + keyLength, ": ", 2) != 0)
        return nullptr;
    return entry + keyLength + 2;
}

// Index of the first entry of key, or -1.
int FindEntry(char *const *list, const char *key) {
    for (int i = 0; list != nullptr && list[i] != nullptr; ++i) {
        if (EntryValue(list[i], key) != nullptr)
            return i;
    }
    return -1;
}

bool IsRegularFile(const char *path) {
    struct stat status {};
    return path != nullptr && stat(path, &status) == 0 &&
           S_ISREG(status.st_mode);
}

// The lines of text; a '\r' is dropped only where it ends a line that a
// '\n' terminates, so other bytes (Latin-1 included) pass through unchanged.
// Lines may be of any length.
std::vector<std::string_view> SplitLines(std::string_view text) {
    std::vector<std::string_view> lines;
    std::size_t start = 0;
    while (start < text.size()) {
        const std::size_t newline = text.find('\n', start);
        if (newline == std::string_view::npos) {
            lines.push_back(text.substr(start));
            break;
        }
        std::string_view line = text.substr(start, newline - start);
        if (!line.empty() && line.back() == '\r')
            line.remove_suffix(1);
        lines.push_back(line);
        start = newline + 1;
    }
    return lines;
}

// The whole file; false when it cannot be read.
bool ReadWholeFile(const char *path, std::string &bytes) {
    std::ifstream stream(path, std::ios::binary);
    if (!stream)
        return false;
    bytes.assign(std::istreambuf_iterator<char>(stream),
                 std::istreambuf_iterator<char>());
    return !stream.bad();
}

} // namespace

int CountStringList(char *const *list) {
    int count = 0;
    if (list != nullptr) {
        while (list[count] != nullptr)
            ++count;
    }
    return count;
}

char **AddStringToList(char **list, const char *text) {
    const char *copied = TextOrEmpty(text);
    return AppendCopies(list, &copied, 1);
}

char **AddStringList(char **list, char *const *other) {
    return AppendCopies(list, other, CountStringList(other));
}

void DestroyStringList(char **list) {
    if (list == nullptr)
        return;
    for (char **text = list; *text != nullptr; ++text)
        std::free(*text);
    std::free(list);
}

char **DuplicateStringList(char *const *list) {
    return AddStringList(nullptr, list);
}

char **TextFileToStringList(const char *path) {
    if (!IsRegularFile(path))
        return nullptr;
    std::string bytes;
    if (!ReadWholeFile(path, bytes))
        return nullptr;
    const std::string text = TextAsUtf8(std::move(bytes));
    const std::vector<std::string_view> lines = SplitLines(text);
    // Zeroed slots keep the list terminated while it fills; a readable
    // empty file gives a list with no texts that is not null.
    HostList list(
        static_cast<char **>(HCalloc(lines.size() + 1, sizeof(char *))));
    if (!list)
        throw std::bad_alloc();
    std::size_t count = 0;
    for (std::string_view line : lines) {
        char *copy = static_cast<char *>(HMalloc(line.size() + 1));
        if (copy == nullptr)
            throw std::bad_alloc();
        std::memcpy(copy, line.data(), line.size());
        copy[line.size()] = '\0';
        list.get()[count++] = copy;
    }
    return list.release();
}

const char *MakeAuxEntry(const char *key, const char *value) {
    return MkName("%s: %s", TextOrEmpty(key), TextOrEmpty(value));
}

char **SetAuxEntry(char **list, const char *key, const char *value) {
    if (key == nullptr)
        return list;
    // The entry text is formatted before anything is freed: value may point
    // into the entry being replaced.
    const char *text = MakeAuxEntry(key, value);
    int index = FindEntry(list, key);
    if (index < 0)
        return AppendCopies(list, &text, 1);
    char *copy = HString(text);
    if (copy == nullptr)
        throw std::bad_alloc();
    std::free(list[index]);
    list[index] = copy;
    return list;
}

const char *FetchAuxEntry(char *const *list, const char *key) {
    if (key == nullptr)
        return nullptr;
    int index = FindEntry(list, key);
    return index < 0 ? nullptr : EntryValue(list[index], key);
}

char **DeleteAuxEntries(char **list, const char *key, const char *value,
                        int all) {
    if (list == nullptr || key == nullptr)
        return list;
    int kept = 0;
    for (int i = 0; list[i] != nullptr; ++i) {
        const char *entryValue = EntryValue(list[i], key);
        bool remove =
            entryValue != nullptr &&
            (all != 0 || std::strcmp(entryValue, TextOrEmpty(value)) == 0);
        if (remove)
            std::free(list[i]);
        else
            list[kept++] = list[i];
    }
    list[kept] = nullptr;
    return list;
}

int DKCheck(const char *path) { return IsRegularFile(path) ? 1 : 0; }
