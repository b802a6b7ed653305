#pragma once

#include <geotiffio.h>
#include <tiffio.h>

#include <string>
#include <vector>

namespace rs2test {

/// The doubles a georeferencing tag holds (pixel scale, tie points,
/// transformation matrix); none when the file has no such tag.
inline std::vector<double> DoubleArray(TIFF *tiff, ttag_t tag) {
    uint16_t count = 0;
    double *values = nullptr;
    if (TIFFGetField(tiff, tag, &count, &values) != 1)
        return {};
    return std::vector<double>(values, values + count);
}

/// The text of an ASCII tag, libtiff's own or one it read without knowing
/// it; empty when the file has no such tag.
inline std::string AsciiTag(TIFF *tiff, ttag_t tag) {
    const TIFFField *field = TIFFFieldWithTag(tiff, tag);
    if (field == nullptr)
        return {};
    char *text = nullptr;
    uint32_t count = 0;
    const int found = TIFFFieldPassCount(field)
                          ? TIFFGetField(tiff, tag, &count, &text)
                          : TIFFGetField(tiff, tag, &text);
    return found == 1 && text != nullptr ? std::string(text) : std::string();
}

/// The 16-bit value of a GeoKey, or -1 when the file has no such key.
inline int ShortKey(GTIF *gtif, geokey_t key) {
    unsigned short value = 0;
    return GTIFKeyGetSHORT(gtif, key, &value, 0, 1) == 1 ? value : -1;
}

} // namespace rs2test
