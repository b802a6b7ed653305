#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

// The steps from the samples a dataset delivers to the backscatter an
// analyst exports: power, noise removed, multilooked, in dB. Each works on
// rows of pixel-interleaved values, one float per channel once in power.

// How a channel's samples become power: calibrated detected samples are
// power already; uncalibrated detected samples are amplitudes (power is
// their square); complex samples give |I + jQ|^2.
enum class PowerRule { AsIs, Squared, ComplexPair };

// Power of `pixels` pixels of `channels` channels from floats a real read
// gave (two per complex sample) into power (one per channel).
void PowerFromReals(const float *values, size_t pixels, size_t channels,
                    PowerRule rule, float *power);

// The same from the words an integer read gave: a complex int16 word packs
// the in-phase sample in its low half and the quadrature in its high half.
void PowerFromWords(const int32_t *words, size_t pixels, size_t channels,
                    PowerRule rule, float *power);

// Subtracts noise[x] (power) from every channel of every pixel in column x
// of `rows` rows of width pixels. Differences below zero are kept, or set to
// zero when clamp is set.
void SubtractNoise(float *power, int32_t width, int32_t rows, size_t channels,
                   const std::vector<float> &noise, bool clamp);

// A boxcar of `lines` rows by `columns` columns.
struct Looks {
    int32_t lines = 1;
    int32_t columns = 1;
};

// Output size of multilooking `size` samples: one output sample per started
// block, so that no sample at the edge is dropped.
int32_t LookedSize(int32_t size, int32_t looks);

// Mean power of each block of `looks` in `rows` rows of width pixels into
// LookedSize(rows, lines) rows of LookedSize(width, columns) pixels. Blocks
// at the right and bottom edges average the samples they hold. Sums are
// kept in double precision.
void Multilook(const float *power, int32_t width, int32_t rows, size_t channels,
               Looks looks, float *looked);

// 10 log10 of every value in place; zero, negative and not-a-number powers
// have no logarithm and become NaN.
void ToDecibels(float *values, size_t count);
