#include "host/fileio/QueryComponents.hpp"

#include <algorithm>

namespace orv::core::fileio {

namespace {

auto KeyIs(const std::string &key) {
    return
        [&key](const QueryComponents::Pair &pair) { return pair.first == key; };
}

} // namespace

void QueryComponents::AddPair(const std::string &key,
                              const std::string &value) {
    pairs.emplace_back(key, value);
}

void QueryComponents::SetPair(const std::string &key,
                              const std::string &value) {
    auto hasKey = KeyIs(key);
    auto first = std::find_if(pairs.begin(), pairs.end(), hasKey);
    if (first == pairs.end()) {
        AddPair(key, value);
        return;
    }
    first->second = value;
    pairs.erase(std::remove_if(first + 1, pairs.end(), hasKey), pairs.end());
}

std::string QueryComponents::GetFirstValue(const std::string &key) const {
    auto found = std::find_if(pairs.begin(), pairs.end(), KeyIs(key));
    return found != pairs.end() ? found->second : std::string();
}

bool QueryComponents::HasKey(const std::string &key) const {
    return std::any_of(pairs.begin(), pairs.end(), KeyIs(key));
}

} // namespace orv::core::fileio
