#include "tests/support/TiffContents.hpp"

#include "tests/support/TiffInspection.hpp"

#include <geotiffio.h>

namespace rs2test {

namespace {
struct GtifDeleter {
    void operator()(GTIF *gtif) const { GTIFFree(gtif); }
};
} // namespace

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
    const auto rowBytes = static_cast<size_t>(TIFFScanlineSize64(t));
    contents.pixels.resize(rowBytes * contents.height);
    for (uint32_t row = 0; row < contents.height; ++row)
        if (TIFFReadScanline(t, contents.pixels.data() + rowBytes * row, row,
                             0) != 1)
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
