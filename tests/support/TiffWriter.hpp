#pragma once

#include <tiffio.h>

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace rs2test {

/// How a test TIFF stores its samples, and the georeferencing it carries.
struct TiffShape {
    uint32_t width = 0;  // pixels
    uint32_t height = 0; // lines
    uint16_t samplesPerPixel = 1;
    uint16_t bitsPerSample = 16; // a complex sample counts both halves
    uint16_t sampleFormat = SAMPLEFORMAT_UINT;
    uint16_t planarConfig = PLANARCONFIG_CONTIG;
    uint16_t compression = COMPRESSION_NONE;
    uint16_t predictor = PREDICTOR_NONE;
    uint16_t photometric = PHOTOMETRIC_MINISBLACK;
    uint32_t rowsPerStrip = 1; // stripped files
    uint32_t tileSize = 0;     // square tiles of this size when non-zero
    bool bigEndian = false;
    /// GeoKeyDirectory entries as (key, SHORT value) pairs, sorted by key;
    /// the geo tags below are written when not empty.
    std::vector<uint16_t> geoKeys;
    std::vector<double> pixelScale;      // ModelPixelScaleTag
    std::vector<double> tiePoints;       // ModelTiepointTag
    std::vector<double> transformMatrix; // ModelTransformationTag
    std::vector<double> rpcCoefficients; // RPCCoefficientTag (50844)
};

/// The value of element `element` of pixel (x, y): elements count across the
/// pixel's samples, two per complex sample (in-phase, then quadrature). The
/// writer casts it to the element type, so it should be exact in that type.
using ElementValue =
    std::function<double(uint32_t x, uint32_t y, uint32_t element)>;

/// Writes shape to path with libtiff; throws std::runtime_error when libtiff
/// refuses. Layouts whose elements are not whole bytes, or whose blocks
/// libtiff sizes differently (subsampled YCbCr), are written as zeros:
/// tests only use such files to see them refused.
void WriteTiff(const std::string &path, const TiffShape &shape,
               const ElementValue &value);

/// The (offset, byte count) of every strip or tile of the file at path, in
/// libtiff's numbering.
std::vector<std::pair<uint64_t, uint64_t>>
StoredBlocks(const std::string &path);

} // namespace rs2test
