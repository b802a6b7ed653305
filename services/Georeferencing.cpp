// Georeferencing of a product: its projection record, an affine UTM
// transform fitted to the geolocation grid, and its ground control points.
//
// Pixel convention. The host's affine transform (ProjInfo_t.transform) is
// pixel-is-area: applied to (column, line) it gives the corner of pixels,
// so (0, 0) is the outer corner of the first pixel and the centre of pixel
// (c, l) lies at (c + 0.5, l + 0.5). Ground control points handed out by the
// host use the same raster positions, the first pixel centre at (0.5, 0.5),
// as the GeoTIFF tie points of the image files do. The tie points of the
// product description instead give pixel centres at integer positions
// ("product coordinates"). So the fit runs in product coordinates, the
// transform is taken at the image corners (-0.5, -0.5) and so on, and the
// tie points go out as ground control points shifted by half a pixel.

#include "host/ProjectionServices.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"
#include "model/ZirOdi2CalibImage.hpp"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <vector>

namespace {

// The system in which the tie points' longitudes and latitudes are handed to
// the transform.
constexpr const char *kTiePointGeosys = "LON D000";
constexpr const char *kPixelGeosys = "PIXEL";
constexpr const char *kGcpGroundGeosys = "LONG      WGS84";
constexpr const char *kMetreUnits = "METER";
// Degree asked of the fit; the host lowers it to what the points support.
constexpr int32_t kFitOrder = 5;
// Product coordinates of a pixel centre plus this give its raster position.
constexpr double kCentreOffset = 0.5;

// The tie points of the model, usable only when every array is present (a
// setter refuses a missing source and leaves its array null).
struct TiePoints {
    int32_t count;
    const double *pixels;
    const double *lines;
    const double *latitudes;
    const double *longitudes;
    const double *heights;

    int32_t Usable() const {
        const bool complete =
            pixels && lines && latitudes && longitudes && heights;
        return complete && count > 0 ? count : 0;
    }
};

// A positive size entry of the metadata, read as atoi reads it, or 0 when
// absent, not positive or beyond the 32-bit range (where atoi's result is
// undefined): product.xml declares these sizes, and nothing bounds them.
int32_t PositiveEntry(char *const *metadata, const char *key) {
    const char *text = FetchAuxEntry(metadata, key);
    const long value = text ? std::strtol(text, nullptr, 10) : 0;
    return value > 0 && value <= std::numeric_limits<int32_t>::max()
               ? static_cast<int32_t>(value)
               : 0;
}

// Easting and northing of every tie point in the zone of utm; false when
// one of them cannot be carried there.
bool ProjectTiePoints(const TiePoints &ties, const char *geographic,
                      const char *utm, std::vector<double> &eastings,
                      std::vector<double> &northings) {
    const int32_t n = ties.Usable();
    eastings.assign(n, 0.0);
    northings.assign(n, 0.0);
    for (int32_t i = 0; i < n; ++i)
        if (GCTPSimpleTransform(geographic, ties.longitudes[i],
                                ties.latitudes[i], utm, &eastings[i],
                                &northings[i]) != 0)
            return false;
    return true;
}

// The UTM system of the first tie point, normalised: one zone for the whole
// product, even when the grid crosses a zone border.
void ZoneOfFirstTiePoint(const TiePoints &ties, char *utm) {
    int32_t zone = 0;
    char band = '\0';
    UTMZone(ties.longitudes[0], ties.latitudes[0], &zone, &band);
    std::snprintf(utm, kGeosysTextSize, "UTM %d %c D000", zone, band);
    DecodeGeosys(utm, utm);
}

struct MapPoint {
    double x = 0.0;
    double y = 0.0;
};

MapPoint MapOf(const GEOInfo_t &fit, double column, double line) {
    MapPoint point;
    GCPTransform(&fit, column, line, &point.x, &point.y);
    return point;
}

void CopyText(char *destination, const char *text) {
    if (destination != nullptr)
        std::strcpy(destination, text);
}

void WriteGcpTexts(char *pixelUnits, char *groundGeosys, char *elevationUnits,
                   char *groundUnits) {
    CopyText(elevationUnits, kMetreUnits);
    CopyText(groundUnits, kMetreUnits);
    CopyText(pixelUnits, kPixelGeosys);
    CopyText(groundGeosys, kGcpGroundGeosys);
}

} // namespace

int32_t ZirOdi2CalibImage::GeoReference(ProjInfo_t *record) {
    EnsureChannels();
    if (record == nullptr)
        return kGeosysUnknown;
    const TiePoints ties{tiePointCount, tiePixels,     tieLines,
                         tieLatitudes,  tieLongitudes, tieHeights};
    const int32_t columns = PositiveEntry(metadata, "ColumnCount");
    const int32_t rows = PositiveEntry(metadata, "RowCount");
    // Without tie points or the image size there is nothing to fit; the
    // record stays as the caller initialised it.
    const int32_t n = ties.Usable();
    if (n == 0 || columns == 0 || rows == 0)
        return DecodeGeosys(record->geosys, nullptr);

    char geographic[kGeosysTextSize];
    DecodeGeosys(kTiePointGeosys, geographic);
    char utm[kGeosysTextSize];
    ZoneOfFirstTiePoint(ties, utm);

    std::vector<double> eastings;
    std::vector<double> northings;
    GEOInfo_t fit{};
    int32_t order = kFitOrder;
    if (!ProjectTiePoints(ties, geographic, utm, eastings, northings) ||
        GCPRegression2(&fit, kPixelGeosys, ties.pixels, ties.lines, utm,
                       eastings.data(), northings.data(), n, &order, 0, nullptr,
                       nullptr) != 0)
        return DecodeGeosys(record->geosys, nullptr);

    // The affine transform through three outer corners of the image, in
    // product coordinates: the fit may be curved, the record holds only its
    // plane through these corners.
    const double left = -kCentreOffset;
    const double top = -kCentreOffset;
    const MapPoint upperLeft = MapOf(fit, left, top);
    const MapPoint upperRight = MapOf(fit, left + columns, top);
    const MapPoint lowerLeft = MapOf(fit, left, top + rows);
    const double xStepPerColumn = (upperRight.x - upperLeft.x) / columns;
    const double yStepPerLine = (lowerLeft.y - upperLeft.y) / rows;
    const double xStepPerLine = (lowerLeft.x - upperLeft.x) / rows;
    const double yStepPerColumn = (upperRight.y - upperLeft.y) / columns;
    Geosys2ProjInfo2(record, utm, upperLeft.x, upperLeft.y, xStepPerColumn,
                     yStepPerLine, xStepPerLine, yStepPerColumn);
    return DecodeGeosys(record->geosys, nullptr);
}

void ZirOdi2CalibImage::GcpSegment(int32_t *count, char *pixelUnits,
                                   char *groundGeosys, char *elevationUnits,
                                   char *groundUnits, int32_t *ids,
                                   double *pixels, double *lines,
                                   double *pixelHeights, double *longitudes,
                                   double *latitudes, double *heights) {
    EnsureChannels();
    const TiePoints ties{tiePointCount, tiePixels,     tieLines,
                         tieLatitudes,  tieLongitudes, tieHeights};
    const int32_t n = ties.Usable();
    const ChannelRecord *first = FindChannel(1);
    if (n == 0 && first != nullptr && first->band != nullptr) {
        // The image file's own points; the host hands out at most
        // kMaxGcpSegmentPoints, which is what the caller's arrays hold.
        if (FILE *image = OpenBand(*first->band)) {
            VXBGcpIO(image, 0, 1, 1, count, pixelUnits, groundGeosys,
                     elevationUnits, groundUnits, ids, pixels, lines,
                     pixelHeights, longitudes, latitudes, heights);
            return;
        }
    }
    // At most kMaxGcpSegmentPoints points, whatever the grid size: an even
    // stride keeps them spread over the whole grid, tie point 0 among them.
    // Their positions move from product coordinates to raster positions.
    const int32_t step = std::max<int32_t>(1, (n + kMaxGcpSegmentPoints - 1) /
                                                  kMaxGcpSegmentPoints);
    int32_t written = 0;
    for (int32_t i = 0; i < n; i += step) {
        pixels[written] = ties.pixels[i] + kCentreOffset;
        lines[written] = ties.lines[i] + kCentreOffset;
        pixelHeights[written] = 0.0;
        longitudes[written] = ties.longitudes[i];
        latitudes[written] = ties.latitudes[i];
        heights[written] = ties.heights[i];
        ids[written] = written + 1;
        ++written;
    }
    if (count != nullptr)
        *count = written;
    WriteGcpTexts(pixelUnits, groundGeosys, elevationUnits, groundUnits);
}
