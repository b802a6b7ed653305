#pragma once

#include "host/Visibility.hpp"

#include <string>
#include <utility>
#include <vector>

namespace orv::core::fileio {

/// The key/value pairs of a URI query, in order; a key may repeat.
class VXB_API QueryComponents {
  public:
    using Pair = std::pair<std::string, std::string>;

    void AddPair(const std::string &key, const std::string &value);
    /// Gives key the single value value: the first pair of key is replaced and
    /// later ones removed; a missing key is appended.
    void SetPair(const std::string &key, const std::string &value);
    /// The value of the first pair of key, empty when there is none.
    std::string GetFirstValue(const std::string &key) const;
    bool HasKey(const std::string &key) const;
    const std::vector<Pair> &Pairs() const { return pairs; }
    bool Empty() const { return pairs.empty(); }

  private:
    std::vector<Pair> pairs;
};

} // namespace orv::core::fileio
