#pragma once

#include <cstdint>
#include <string>
#include <vector>

/// An 8-bit image, rows top to bottom, the samples of a pixel side by side:
/// 1 sample a pixel is grey, 3 are red, green and blue.
struct Image8 {
    int32_t width = 0;            // pixels
    int32_t height = 0;           // rows
    int32_t samplesPerPixel = 1;  // 1 or 3
    std::vector<uint8_t> samples; // width * height * samplesPerPixel
};

/// Writes the image to path as a PNG, creating or replacing the file. Throws
/// std::runtime_error naming the path and the cause when the file cannot be
/// opened or written (what was written by then stays, for the caller to
/// remove), std::invalid_argument for another number of samples a pixel.
void WritePng(const std::string &path, const Image8 &image);
