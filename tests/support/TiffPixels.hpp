#pragma once

// Header only and libtiff only, so that benchmarks can use it too.

#include <tiffio.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <vector>

namespace rs2test {

/// The pixels of the current image, row after row, whether it is tiled or
/// stripped; empty when they cannot be read.
inline std::vector<unsigned char> ReadPixels(TIFF *tiff) {
    uint32_t width = 0, height = 0;
    TIFFGetField(tiff, TIFFTAG_IMAGEWIDTH, &width);
    TIFFGetField(tiff, TIFFTAG_IMAGELENGTH, &height);
    const auto rowBytes = static_cast<size_t>(TIFFScanlineSize64(tiff));
    std::vector<unsigned char> pixels(rowBytes * height);
    if (!TIFFIsTiled(tiff)) {
        for (uint32_t row = 0; row < height; ++row)
            if (TIFFReadScanline(tiff, pixels.data() + rowBytes * row, row,
                                 0) != 1)
                return {};
        return pixels;
    }
    uint32_t tileWidth = 0, tileHeight = 0;
    TIFFGetField(tiff, TIFFTAG_TILEWIDTH, &tileWidth);
    TIFFGetField(tiff, TIFFTAG_TILELENGTH, &tileHeight);
    const size_t pixelBytes = rowBytes / width;
    std::vector<unsigned char> tile(static_cast<size_t>(TIFFTileSize64(tiff)));
    for (uint32_t y = 0; y < height; y += tileHeight)
        for (uint32_t x = 0; x < width; x += tileWidth) {
            if (TIFFReadTile(tiff, tile.data(), x, y, 0, 0) < 0)
                return {};
            const size_t bytes = pixelBytes * std::min(tileWidth, width - x);
            for (uint32_t row = 0; row < tileHeight && y + row < height; ++row)
                std::memcpy(pixels.data() + rowBytes * (y + row) +
                                pixelBytes * x,
                            tile.data() + pixelBytes * tileWidth * row, bytes);
        }
    return pixels;
}

} // namespace rs2test
