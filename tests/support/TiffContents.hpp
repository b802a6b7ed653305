#pragma once

#include <tiffio.h>
#include <xtiffio.h>

#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

namespace rs2test {

struct TiffCloser {
    void operator()(TIFF *tiff) const { XTIFFClose(tiff); }
};
using TiffKeeper = std::unique_ptr<TIFF, TiffCloser>;

/// What a GeoTIFF holds, read with libtiff and libgeotiff alone.
struct TiffContents {
    uint32_t width = 0, height = 0;
    uint16_t bits = 0, format = 0, samples = 0;
    std::vector<unsigned char> pixels;
    int modelType = -1, rasterType = -1, projected = -1, geographic = -1;
    std::vector<double> matrix, ties;

    template <typename T> T Sample(size_t index) const {
        T value;
        std::memcpy(&value, pixels.data() + index * sizeof(T), sizeof(T));
        return value;
    }
};

/// The file's pixels, matrix, tie points and main GeoKeys; empty contents
/// when it cannot be read.
TiffContents ReadTiff(const std::string &path);

} // namespace rs2test
