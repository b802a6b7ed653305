#pragma once

#include <cstddef>
#include <vector>

/// An offset and one value per range column. It holds calibration gains and
/// incidence angles; reading past its end gives 1.0, the neutral gain.
class LookupTable {
  public:
    explicit LookupTable(std::size_t capacity = 0);

    std::size_t Size() const { return values.size(); }
    /// Entry i, or 1.0 when i is not below Size().
    float Get(std::size_t i) const;
    /// Overwrites entry i; i must be below Size().
    void Set(std::size_t i, float value);
    float Offset() const { return offset; }
    void SetOffset(float value) { offset = value; }
    /// Discards every entry, then holds n entries of 0.0.
    void Resize(std::size_t n);

  private:
    float offset = 0.0f;
    std::vector<float> values;
};
