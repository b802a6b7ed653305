#include "tests/support/TiffWriter.hpp"

#include <algorithm>
#include <cstdarg>
#include <cstring>
#include <memory>
#include <stdexcept>

namespace rs2test {
namespace {

struct TiffCloser {
    void operator()(TIFF *tif) const { TIFFClose(tif); }
};
using TiffOwner = std::unique_ptr<TIFF, TiffCloser>;

// The geo tags are unknown to a plain libtiff reader, which warns about them.
int IgnoreWarning(TIFF *, void *, const char *, const char *, va_list) {
    return 1;
}

constexpr ttag_t kGeoPixelScaleTag = 33550;
constexpr ttag_t kGeoTiePointsTag = 33922;
constexpr ttag_t kGeoTransformMatrixTag = 34264;
constexpr ttag_t kGeoKeyDirectoryTag = 34735;
constexpr ttag_t kRpcCoefficientTag = 50844;

// libtiff writes only tags it has definitions for.
void DefineGeoTags(TIFF *tif) {
    static char pixelScale[] = "GeoPixelScale";
    static char tiePoints[] = "GeoTiePoints";
    static char matrix[] = "GeoTransformationMatrix";
    static char keys[] = "GeoKeyDirectory";
    static char rpc[] = "RPCCoefficient";
    static const TIFFFieldInfo fields[] = {
        {kGeoPixelScaleTag, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_DOUBLE,
         FIELD_CUSTOM, 1, 1, pixelScale},
        {kGeoTiePointsTag, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_DOUBLE,
         FIELD_CUSTOM, 1, 1, tiePoints},
        {kGeoTransformMatrixTag, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_DOUBLE,
         FIELD_CUSTOM, 1, 1, matrix},
        {kGeoKeyDirectoryTag, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_SHORT,
         FIELD_CUSTOM, 1, 1, keys},
        {kRpcCoefficientTag, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_DOUBLE,
         FIELD_CUSTOM, 1, 1, rpc},
    };
    if (TIFFMergeFieldInfo(tif, fields, std::size(fields)) != 0)
        throw std::runtime_error("cannot define the GeoTIFF tags");
}

template <typename T>
void SetArrayField(TIFF *tif, ttag_t tag, const std::vector<T> &values) {
    if (!values.empty() &&
        TIFFSetField(tif, tag, static_cast<int>(values.size()),
                     values.data()) != 1)
        throw std::runtime_error("cannot set tag " + std::to_string(tag));
}

// GeoKeyDirectory: version 1.1.0 header, then (key, location 0 = the value
// itself, count 1, value) per key.
std::vector<uint16_t> KeyDirectory(const std::vector<uint16_t> &pairs) {
    std::vector<uint16_t> directory = {1, 1, 0,
                                       static_cast<uint16_t>(pairs.size() / 2)};
    for (size_t i = 0; i + 1 < pairs.size(); i += 2)
        directory.insert(directory.end(), {pairs[i], 0, 1, pairs[i + 1]});
    return directory;
}

void SetLayoutFields(TIFF *tif, const TiffShape &shape) {
    // BitsPerSample before SampleFormat: libtiff picks the byte swapping of
    // complex samples from both, in that order.
    TIFFSetField(tif, TIFFTAG_IMAGEWIDTH, shape.width);
    TIFFSetField(tif, TIFFTAG_IMAGELENGTH, shape.height);
    TIFFSetField(tif, TIFFTAG_SAMPLESPERPIXEL, shape.samplesPerPixel);
    TIFFSetField(tif, TIFFTAG_BITSPERSAMPLE, shape.bitsPerSample);
    TIFFSetField(tif, TIFFTAG_SAMPLEFORMAT, shape.sampleFormat);
    TIFFSetField(tif, TIFFTAG_PLANARCONFIG, shape.planarConfig);
    TIFFSetField(tif, TIFFTAG_PHOTOMETRIC, shape.photometric);
    if (shape.photometric == PHOTOMETRIC_YCBCR)
        TIFFSetField(tif, TIFFTAG_YCBCRSUBSAMPLING, 2, 2);
    if (TIFFSetField(tif, TIFFTAG_COMPRESSION, shape.compression) != 1)
        throw std::runtime_error("compression not available");
    if (shape.predictor != PREDICTOR_NONE)
        TIFFSetField(tif, TIFFTAG_PREDICTOR, shape.predictor);
    if (shape.tileSize > 0) {
        TIFFSetField(tif, TIFFTAG_TILEWIDTH, shape.tileSize);
        TIFFSetField(tif, TIFFTAG_TILELENGTH, shape.tileSize);
    } else {
        TIFFSetField(tif, TIFFTAG_ROWSPERSTRIP, shape.rowsPerStrip);
    }
}

void SetGeoFields(TIFF *tif, const TiffShape &shape) {
    DefineGeoTags(tif);
    SetArrayField(tif, kGeoPixelScaleTag, shape.pixelScale);
    SetArrayField(tif, kGeoTiePointsTag, shape.tiePoints);
    SetArrayField(tif, kGeoTransformMatrixTag, shape.transformMatrix);
    if (!shape.geoKeys.empty())
        SetArrayField(tif, kGeoKeyDirectoryTag, KeyDirectory(shape.geoKeys));
    SetArrayField(tif, kRpcCoefficientTag, shape.rpcCoefficients);
}

template <typename T> void Store(unsigned char *at, double value) {
    const T typed = static_cast<T>(value);
    std::memcpy(at, &typed, sizeof typed);
}

using Storer = void (*)(unsigned char *, double);

// How one element is stored, or null for elements that are not whole bytes.
Storer ElementStorer(uint16_t format, uint16_t elementBits) {
    const bool complex = format == SAMPLEFORMAT_COMPLEXINT ||
                         format == SAMPLEFORMAT_COMPLEXIEEEFP;
    const bool isFloat =
        format == SAMPLEFORMAT_IEEEFP || format == SAMPLEFORMAT_COMPLEXIEEEFP;
    const bool isSigned = format == SAMPLEFORMAT_INT || complex;
    if (isFloat)
        return elementBits == 32   ? Store<float>
               : elementBits == 64 ? Store<double>
                                   : nullptr;
    switch (elementBits) {
    case 8:
        return isSigned ? Store<int8_t> : Store<uint8_t>;
    case 16:
        return isSigned ? Store<int16_t> : Store<uint16_t>;
    case 32:
        return isSigned ? Store<int32_t> : Store<uint32_t>;
    default:
        return nullptr;
    }
}

// Where a block lies and how its elements are numbered.
struct BlockPlace {
    uint32_t plane;
    uint32_t x0, y0;       // image position of its first pixel
    uint32_t width, lines; // pixels and lines it holds
};

class BlockFiller {
  public:
    explicit BlockFiller(const TiffShape &specIn) : shape(specIn) {
        const bool complex = shape.sampleFormat == SAMPLEFORMAT_COMPLEXINT ||
                             shape.sampleFormat == SAMPLEFORMAT_COMPLEXIEEEFP;
        elementsPerSample = complex ? 2 : 1;
        const uint16_t elementBits = shape.bitsPerSample / elementsPerSample;
        store = shape.photometric == PHOTOMETRIC_YCBCR
                    ? nullptr
                    : ElementStorer(shape.sampleFormat, elementBits);
        elementBytes = elementBits / 8;
        separate = shape.planarConfig == PLANARCONFIG_SEPARATE;
        pixelElements = separate ? elementsPerSample
                                 : shape.samplesPerPixel * elementsPerSample;
    }

    std::vector<unsigned char> Fill(const BlockPlace &place, size_t size,
                                    const ElementValue &value) const {
        std::vector<unsigned char> bytes(size, 0);
        if (store == nullptr ||
            size_t(place.width) * place.lines * pixelElements * elementBytes !=
                size)
            return bytes;
        unsigned char *at = bytes.data();
        const uint32_t firstElement =
            separate ? place.plane * elementsPerSample : 0;
        for (uint32_t y = place.y0; y < place.y0 + place.lines; ++y)
            for (uint32_t x = place.x0; x < place.x0 + place.width; ++x)
                for (uint32_t e = 0; e < pixelElements; ++e) {
                    const bool inside = x < shape.width && y < shape.height;
                    store(at, inside ? value(x, y, firstElement + e) : 0.0);
                    at += elementBytes;
                }
        return bytes;
    }

  private:
    const TiffShape &shape;
    uint32_t elementsPerSample = 1;
    Storer store = nullptr;
    uint32_t elementBytes = 0;
    bool separate = false;
    uint32_t pixelElements = 0;
};

// Writes every strip or tile in libtiff's numbering: plane by plane, row
// by row. A strip is a block as wide as the image; tiles are whole at the
// image edges, while the last strip holds only the lines left.
void WriteBlocks(TIFF *tif, const TiffShape &shape, const ElementValue &value) {
    const BlockFiller filler(shape);
    const bool tiled = shape.tileSize > 0;
    const uint32_t blockWidth = tiled ? shape.tileSize : shape.width;
    const uint32_t blockLines = tiled ? shape.tileSize : shape.rowsPerStrip;
    const uint32_t planes =
        shape.planarConfig == PLANARCONFIG_SEPARATE ? shape.samplesPerPixel : 1;
    const uint32_t across = (shape.width + blockWidth - 1) / blockWidth;
    const uint32_t down = (shape.height + blockLines - 1) / blockLines;
    uint32_t index = 0;
    for (uint32_t plane = 0; plane < planes; ++plane)
        for (uint32_t row = 0; row < down; ++row)
            for (uint32_t column = 0; column < across; ++column, ++index) {
                const uint32_t y0 = row * blockLines;
                const uint32_t lines =
                    tiled ? blockLines
                          : std::min(blockLines, shape.height - y0);
                const auto size = static_cast<tmsize_t>(
                    tiled ? TIFFTileSize(tif) : TIFFVStripSize(tif, lines));
                std::vector<unsigned char> bytes = filler.Fill(
                    {plane, column * blockWidth, y0, blockWidth, lines},
                    size_t(size), value);
                if ((tiled
                         ? TIFFWriteEncodedTile(tif, index, bytes.data(), size)
                         : TIFFWriteEncodedStrip(tif, index, bytes.data(),
                                                 size)) < 0)
                    throw std::runtime_error("cannot write block " +
                                             std::to_string(index));
            }
}

} // namespace

void WriteTiff(const std::string &path, const TiffShape &shape,
               const ElementValue &value) {
    TiffOwner tif(TIFFOpen(path.c_str(), shape.bigEndian ? "wb" : "wl"));
    if (!tif)
        throw std::runtime_error("cannot create " + path);
    SetLayoutFields(tif.get(), shape);
    SetGeoFields(tif.get(), shape);
    WriteBlocks(tif.get(), shape, value);
}

std::vector<std::pair<uint64_t, uint64_t>>
StoredBlocks(const std::string &path) {
    std::unique_ptr<TIFFOpenOptions, void (*)(TIFFOpenOptions *)> options(
        TIFFOpenOptionsAlloc(), TIFFOpenOptionsFree);
    TIFFOpenOptionsSetWarningHandlerExtR(options.get(), IgnoreWarning, nullptr);
    TiffOwner tif(TIFFOpenExt(path.c_str(), "r", options.get()));
    if (!tif)
        throw std::runtime_error("cannot open " + path);
    const uint32_t count = TIFFIsTiled(tif.get())
                               ? TIFFNumberOfTiles(tif.get())
                               : TIFFNumberOfStrips(tif.get());
    std::vector<std::pair<uint64_t, uint64_t>> blocks;
    for (uint32_t i = 0; i < count; ++i)
        blocks.emplace_back(TIFFGetStrileOffset(tif.get(), i),
                            TIFFGetStrileByteCount(tif.get(), i));
    return blocks;
}

} // namespace rs2test
