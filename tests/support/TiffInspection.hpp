#pragma once

#include <geotiffio.h>
#include <tiffio.h>

#include <vector>

namespace rs2test {

/// The values of a counted double tag (pixel scale, tie points, matrix);
/// empty when the file lacks it.
inline std::vector<double> DoubleArray(TIFF *tiff, ttag_t tag) {
    uint16_t count = 0;
    double *values = nullptr;
    if (TIFFGetField(tiff, tag, &count, &values) != 1)
        return {};
    return std::vector<double>(values, values + count);
}

/// A one-value SHORT GeoKey, or -1 when it is absent.
inline int ShortKey(GTIF *gtif, geokey_t key) {
    unsigned short value = 0;
    return GTIFKeyGetSHORT(gtif, key, &value, 0, 1) == 1 ? value : -1;
}

} // namespace rs2test
