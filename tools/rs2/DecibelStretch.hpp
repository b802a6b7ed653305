#pragma once

#include <cstdint>
#include <vector>

// How a preview turns backscatter in dB into 8-bit brightness. A few very
// bright or very dark pixels (corner reflectors, radar shadow) would squeeze
// the rest of the scene into a few grey levels under a min/max stretch, so
// the stretch spans robust percentiles of the scene instead. NaN stands for
// "no data" (power without a logarithm: the fill around the imaged area).

/// The dB values shown as black (low) and white (high).
struct DecibelRange {
    bool empty = true; // no finite value: nothing to stretch
    float low = 0.0f;
    float high = 0.0f;
};

/// The 2nd and 98th percentiles of the finite values. A percentile p is the
/// value of rank round(p / 100 * (n - 1)) among the n finite values sorted
/// in ascending order (rank 0 first). NaN values are left out.
DecibelRange PercentileRange(const std::vector<float> &decibels);

/// Brightness of a dB value: 0 at or below range.low, 255 at or above
/// range.high, linear in dB in between (rounded to the nearest level). A
/// range of one value (a constant image) maps every value to 128, mid-grey.
/// NaN maps to 0.
uint8_t StretchedLevel(float decibels, const DecibelRange &range);
