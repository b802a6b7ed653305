#include "tools/rs2/DecibelStretch.hpp"

#include <algorithm>
#include <cmath>
#include <iterator>

namespace {

constexpr double kLowPercentile = 2.0;
constexpr double kHighPercentile = 98.0;

// Index of the percentile's rank among n sorted values.
size_t PercentileRank(double percentile, size_t n) {
    return static_cast<size_t>(
        std::lround(percentile / 100.0 * static_cast<double>(n - 1)));
}

} // namespace

DecibelRange PercentileRange(const std::vector<float> &decibels) {
    std::vector<float> finite;
    finite.reserve(decibels.size());
    std::copy_if(decibels.begin(), decibels.end(), std::back_inserter(finite),
                 [](float value) { return std::isfinite(value); });
    DecibelRange range;
    if (finite.empty())
        return range;
    const auto low =
        finite.begin() + static_cast<std::ptrdiff_t>(
                             PercentileRank(kLowPercentile, finite.size()));
    const auto high =
        finite.begin() + static_cast<std::ptrdiff_t>(
                             PercentileRank(kHighPercentile, finite.size()));
    // The high rank is never below the low one, so it is selected among
    // the values the first selection left from the low rank on, once the
    // low value is taken (the second selection reorders them).
    std::nth_element(finite.begin(), low, finite.end());
    range.low = *low;
    std::nth_element(low, high, finite.end());
    range.high = *high;
    range.empty = false;
    return range;
}

uint8_t StretchedLevel(float decibels, const DecibelRange &range) {
    if (std::isnan(decibels))
        return 0;
    if (!(range.high > range.low))
        return 128;
    const double scaled = 255.0 * (static_cast<double>(decibels) - range.low) /
                          (static_cast<double>(range.high) - range.low);
    return static_cast<uint8_t>(std::lround(std::clamp(scaled, 0.0, 255.0)));
}
