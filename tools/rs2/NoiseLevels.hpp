#pragma once

#include <cstdint>
#include <string>
#include <vector>

// The noise-equivalent backscatter a product states for one calibration
// (its referenceNoiseLevel element): levels in dB at the columns
// firstPixel, firstPixel + step, ... of the full image.
struct NoiseLevels {
    int32_t firstPixel = 0;
    int32_t step = 1;
    std::vector<double> levelsDb;

    // The noise power (linear) at a column of the full image: the levels
    // interpolated linearly in dB between the columns they are given at,
    // held at the end values beyond the first and the last.
    double PowerAt(double column) const;
};

// The levels the product annotation (product.xml, as text) gives for a
// calibration named as the product names it ("Sigma Nought", "Beta Nought",
// "Gamma"). Throws std::runtime_error when the annotation gives none for it
// or gives them inconsistently (a count that disagrees with the values, a
// step below 1, a value that is not a finite number).
NoiseLevels ReadNoiseLevels(const std::string &annotation,
                            const std::string &calibration);
