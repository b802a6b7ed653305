// The incidence-angle array segment: one angle in degrees per image column,
// taken from the table the loader derived from the Sigma and Beta gains.

#include "model/ZirOdi2CalibImage.hpp"

#include "host/TextServices.hpp"

#include <algorithm>
#include <cstddef>
#include <cstring>

namespace {

constexpr char kIncidenceArrayName[] = "Incidence Angle Map";

} // namespace

void ZirOdi2CalibImage::IncidenceAngles(double *out) {
    if (out == nullptr)
        return;
    // Columns past the end of the table (an image wider than its look-up
    // tables, or no tables at all) read the table's neutral 1.0.
    const LookupTable &angles = IncidenceTable();
    const int32_t width = Width();
    for (int32_t k = 0; k < width; ++k)
        out[k] = static_cast<double>(angles.Get(static_cast<std::size_t>(k)));
}

void ZirOdi2CalibImage::IncidenceArraySegment(int32_t *dimensionCount,
                                              int32_t *valueCount,
                                              double **values, char *name) {
    const int32_t width = std::max(Width(), 0);
    if (dimensionCount != nullptr)
        *dimensionCount = 1;
    if (valueCount != nullptr)
        *valueCount = width;
    if (name != nullptr)
        std::memcpy(name, kIncidenceArrayName, sizeof kIncidenceArrayName);
    if (values == nullptr)
        return;
    // The caller owns the array and releases it with free().
    *values = static_cast<double *>(
        HMalloc(static_cast<std::size_t>(width) * sizeof(double)));
    if (*values != nullptr)
        IncidenceAngles(*values);
}
