#include "host/StringLists.hpp"
#include "host/HostMemory.hpp"

#include "host/TextServices.hpp"

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <memory>
#include <new>
#include <string>
#include <vector>

#include <sys/stat.h>

namespace {

using host::FreeDeleter;

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

// A list with no texts that is not null: the answer for a readable empty file.
char **NewEmptyList() {
    auto *list = static_cast<char **>(HCalloc(1, sizeof(char *)));
    if (list == nullptr)
        throw std::bad_alloc();
    return list;
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

// The lines of stream; a '\r' is dropped only where it ends a line that a
// '\n' terminates, so other bytes (Latin-1 included) pass through unchanged.
bool ReadLines(std::ifstream &stream, std::vector<std::string> &lines) {
    std::string line;
    while (std::getline(stream, line)) {
        bool newlineTerminated = !stream.eof();
        if (newlineTerminated && !line.empty() && line.back() == '\r')
            line.pop_back();
        lines.push_back(line);
    }
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
    std::ifstream stream(path, std::ios::binary);
    if (!stream)
        return nullptr;
    std::vector<std::string> lines;
    if (!ReadLines(stream, lines))
        return nullptr;
    std::vector<const char *> texts;
    texts.reserve(lines.size());
    for (const std::string &line : lines)
        texts.push_back(line.c_str());
    return AppendCopies(NewEmptyList(), texts.data(),
                        static_cast<int>(texts.size()));
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
