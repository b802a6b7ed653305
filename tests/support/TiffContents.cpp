#include "tests/support/TiffContents.hpp"

#include "tests/support/TiffInspection.hpp"
#include "tests/support/TiffPixels.hpp"

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
