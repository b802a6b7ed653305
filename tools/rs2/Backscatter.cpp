#include "tools/rs2/Backscatter.hpp"

#include <algorithm>
#include <cmath>
#include <limits>

namespace {

float SquaredSum(double inPhase, double quadrature) {
    return static_cast<float>(inPhase * inPhase + quadrature * quadrature);
}

} // namespace

void PowerFromReals(const float *values, size_t pixels, size_t channels,
                    PowerRule rule, float *power) {
    const size_t count = pixels * channels;
    for (size_t i = 0; i < count; ++i) {
        switch (rule) {
        case PowerRule::AsIs:
            power[i] = values[i];
            break;
        case PowerRule::Squared:
            power[i] = SquaredSum(values[i], 0.0);
            break;
        case PowerRule::ComplexPair:
            power[i] = SquaredSum(values[2 * i], values[2 * i + 1]);
            break;
        }
    }
}

void PowerFromWords(const int32_t *words, size_t pixels, size_t channels,
                    PowerRule rule, float *power) {
    const size_t count = pixels * channels;
    for (size_t i = 0; i < count; ++i) {
        if (rule == PowerRule::ComplexPair) {
            const auto word = static_cast<uint32_t>(words[i]);
            power[i] = SquaredSum(static_cast<int16_t>(word & 0xFFFFu),
                                  static_cast<int16_t>(word >> 16));
        } else if (rule == PowerRule::Squared) {
            power[i] = SquaredSum(words[i], 0.0);
        } else {
            power[i] = static_cast<float>(words[i]);
        }
    }
}

void SubtractNoise(float *power, int32_t width, int32_t rows, size_t channels,
                   const std::vector<float> &noise, bool clamp) {
    for (int32_t row = 0; row < rows; ++row) {
        float *pixel = power + static_cast<size_t>(row) * width * channels;
        for (int32_t x = 0; x < width; ++x) {
            for (size_t c = 0; c < channels; ++c, ++pixel) {
                *pixel -= noise[x];
                if (clamp && *pixel < 0.0f)
                    *pixel = 0.0f;
            }
        }
    }
}

int32_t LookedSize(int32_t size, int32_t looks) {
    return size / looks + (size % looks != 0 ? 1 : 0);
}

void Multilook(const float *power, int32_t width, int32_t rows, size_t channels,
               Looks looks, float *looked) {
    const int32_t lookedWidth = LookedSize(width, looks.columns);
    const int32_t lookedRows = LookedSize(rows, looks.lines);
    std::vector<double> sums(static_cast<size_t>(lookedWidth) * channels);
    for (int32_t out = 0; out < lookedRows; ++out) {
        std::fill(sums.begin(), sums.end(), 0.0);
        const int32_t first = out * looks.lines;
        const int32_t last = std::min(rows, first + looks.lines);
        for (int32_t row = first; row < last; ++row) {
            const float *pixel =
                power + static_cast<size_t>(row) * width * channels;
            for (int32_t x = 0; x < width; ++x)
                for (size_t c = 0; c < channels; ++c)
                    sums[static_cast<size_t>(x / looks.columns) * channels +
                         c] += *pixel++;
        }
        float *target =
            looked + static_cast<size_t>(out) * lookedWidth * channels;
        for (int32_t x = 0; x < lookedWidth; ++x) {
            const int32_t blockWidth =
                std::min(width, (x + 1) * looks.columns) - x * looks.columns;
            const double samples =
                static_cast<double>(blockWidth) * (last - first);
            for (size_t c = 0; c < channels; ++c)
                target[static_cast<size_t>(x) * channels + c] =
                    static_cast<float>(
                        sums[static_cast<size_t>(x) * channels + c] / samples);
        }
    }
}

void ToDecibels(float *values, size_t count) {
    for (size_t i = 0; i < count; ++i)
        values[i] = values[i] > 0.0f
                        ? static_cast<float>(10.0 * std::log10(values[i]))
                        : std::numeric_limits<float>::quiet_NaN();
}
