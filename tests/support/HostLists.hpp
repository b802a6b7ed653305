#pragma once

#include "host/StringLists.hpp"

#include <optional>
#include <string>
#include <vector>

namespace rs2test {

/// The texts of a host string list, in order; none for a null list.
inline std::vector<std::string> ListTexts(char *const *list) {
    std::vector<std::string> texts;
    for (; list != nullptr && *list != nullptr; ++list)
        texts.emplace_back(*list);
    return texts;
}

/// The value of the first entry of key in a host list, or nothing.
inline std::optional<std::string> ListEntry(char *const *list,
                                            const char *key) {
    const char *value = FetchAuxEntry(list, key);
    return value != nullptr ? std::optional<std::string>(value) : std::nullopt;
}

} // namespace rs2test
