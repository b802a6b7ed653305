#include "tests/support/TiffContents.hpp"

#include "tests/support/TiffInspection.hpp"

#include <geotiffio.h>

#include <algorithm>

namespace rs2test {

namespace {
struct GtifDeleter {
    void operator()(GTIF *gtif) const { GTIFFree(gtif); }
};
} // namespace

std::vector<unsigned char> ReadPixels(TIFF *tiff) {
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

TiffContents ReadTiff(const std::string &path) {
    TiffContents contents;
    TiffKeeper tiff(XTIFFOpen(path.c_str(), "r"));
    if (!tiff)
        return contents;
    TIFF *t = tiff.get();
    TIFFGetField(t, TIFFTAG_IMAGEWIDTH, &contents.width);
    TIFFGetField(t, TIFFTAG_IMAGELENGTH, &contents.height);
    TIFFGetFieldDefaulted(t, TIFFTAG_BITSPERSAMPLE, &contents.bits);
    TIFFGetFieldDefaulted(t, TIFFTAG_SAMPLEFORMAT, &contents.format);
    TIFFGetFieldDefaulted(t, TIFFTAG_SAMPLESPERPIXEL, &contents.samples);
    contents.pixels = ReadPixels(t);
    if (contents.pixels.empty())
        return {};
    contents.matrix = DoubleArray(t, TIFFTAG_GEOTRANSMATRIX);
    contents.ties = DoubleArray(t, TIFFTAG_GEOTIEPOINTS);
    std::unique_ptr<GTIF, GtifDeleter> gtif(GTIFNew(t));
    if (gtif) {
        contents.modelType = ShortKey(gtif.get(), GTModelTypeGeoKey);
        contents.rasterType = ShortKey(gtif.get(), GTRasterTypeGeoKey);
        contents.projected = ShortKey(gtif.get(), ProjectedCSTypeGeoKey);
        contents.geographic = ShortKey(gtif.get(), GeographicTypeGeoKey);
    }
    return contents;
}

} // namespace rs2test
