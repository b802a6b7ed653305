#include "model/LookupTable.hpp"

LookupTable::LookupTable(std::size_t capacity) { values.reserve(capacity); }

float LookupTable::Get(std::size_t i) const {
    return i < values.size() ? values[i] : 1.0f;
}

void LookupTable::Set(std::size_t i, float value) {
    // An index past the end comes from a file that declared more values than
    // the table was sized for; it is dropped rather than written out of
    // bounds.
    if (i < values.size())
        values[i] = value;
}

void LookupTable::Resize(std::size_t n) { values.assign(n, 0.0f); }
