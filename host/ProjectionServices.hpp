#pragma once

#include <cstdint>

// Coordinate systems of the host are 16-character texts ("UTM 10 U D000",
// "LONG D000", "PIXEL", "METER"), kept with their terminating zero in 17 bytes.
//
// Codes returned by DecodeGeosys (the host's own numbering):
//   0  unknown or unsupported text
//   1  LONG  geographic longitude/latitude in degrees ("LONG D000"; "LON",
//            "LONG D0" and "LONG      WGS84" normalise to it)
//   2  UTM   Universal Transverse Mercator ("UTM <zone> <band> D000")
//   3  METER plain metres without a projection
//   5  PIXEL image coordinates, no georeferencing

constexpr int kGeosysTextSize = 17;
constexpr int kProjParmCount = 17;

enum GeosysCode : int32_t {
    kGeosysUnknown = 0,
    kGeosysLong = 1,
    kGeosysUTM = 2,
    kGeosysMeter = 3,
    kGeosysPixel = 5,
};

/// A coordinate system with its affine pixel-to-map transform.
///
/// Pixel convention (pixel is area): the transform takes raster positions
/// (column, line) whose origin (0, 0) is the upper-left CORNER of the first
/// pixel; map x = transform[0] + column * transform[1] + line * transform[2],
/// map y = transform[3] + column * transform[4] + line * transform[5]. The
/// centre of pixel (c, l) is at (c + 0.5, l + 0.5). Ground control points
/// the host hands out (VXBGcpIO) use the same raster positions.
struct ProjInfo_t {
    char geosys[kGeosysTextSize]; // coordinate-system text
    /// GDAL order: upper-left X, X step per column, X step per line,
    /// upper-left Y, Y step per column, Y step per line (map units).
    double transform[6];
    /// Projection parameters; UTM: [0] zone, [1] 1 north / -1 south.
    double parms[kProjParmCount];
};

/// Maximum polynomial degree a GEOInfo_t holds, and its number of terms.
constexpr int kGeoMaxOrder = 5;
constexpr int kGeoMaxTerms = (kGeoMaxOrder + 1) * (kGeoMaxOrder + 2) / 2;

/// A fitted polynomial from image pixel/line to map x/y. Plain data: callers
/// allocate it with HMalloc and release it with free().
struct GEOInfo_t {
    char srcGeosys[kGeosysTextSize];
    char dstGeosys[kGeosysTextSize];
    int32_t order;       // degree actually fitted
    int32_t termCount;   // (order + 1)(order + 2) / 2
    double srcCentre[2]; // pixel, line subtracted before scaling
    double srcScale[2];  // and divided by afterwards
    double xCoefficients[kGeoMaxTerms];
    double yCoefficients[kGeoMaxTerms];
};

/// Sets an empty record ("PIXEL", identity transform, zero parameters) and
/// returns 0. The second argument is reserved (callers pass 0).
int32_t InitProjInfo(ProjInfo_t *record, int32_t reserved);
/// The code of a coordinate-system text; when out is given (it may be text
/// itself) the normalised 16-character form is written there (17 bytes).
int32_t DecodeGeosys(const char *text, char *out);
/// Non-zero when a record of the code needs projection parameters.
int32_t RequiresProjInfo(int32_t code);
/// Fills record for geosys with an unrotated transform.
void Geosys2ProjInfo(ProjInfo_t *record, const char *geosys, double ulx,
                     double uly, double xStepPerColumn, double yStepPerLine);
/// Fills record for geosys with a full affine transform.
void Geosys2ProjInfo2(ProjInfo_t *record, const char *geosys, double ulx,
                      double uly, double xStepPerColumn, double yStepPerLine,
                      double xStepPerLine, double yStepPerColumn);
/// The projection parameters as text: kProjParmCount numbers ("%.17g")
/// separated by single spaces, so that they read back exactly. Null for a
/// null record. The caller frees it with free().
char *ProjInfo2Parms(const ProjInfo_t *record);
/// Reads parameters written by ProjInfo2Parms into record. Parameters the
/// text does not give read as 0; a null text leaves the record as it is.
void ProjParms2Info(const char *parms, ProjInfo_t *record);
/// The UTM zone (1-60) and latitude band letter of a point, with the Norway
/// (32V over 56..64 N, 3..12 E) and Svalbard (31X, 33X, 35X, 37X over
/// 72..84 N) exceptions. Bands run C..X without I and O, 8 degrees each from
/// 80 S, X spanning 72..84 N; latitudes beyond give the nearest band.
/// Longitudes wrap into [-180, 180). A non-finite input gives zone 0 and
/// band '\0'. Null outputs are skipped.
void UTMZone(double longitude, double latitude, int32_t *zone, char *band);
/// Carries one point from one coordinate system to another (geographic
/// longitude/latitude and UTM on WGS84, x being longitude or easting),
/// through PROJ in a per-thread context. Returns 0 on success, non-zero for a
/// system without ground meaning (PIXEL, METER), an unknown text or a point
/// PROJ cannot carry; the outputs are then left as they are.
int32_t GCTPSimpleTransform(const char *srcGeosys, double x, double y,
                            const char *dstGeosys, double *outX, double *outY);
/// Least-squares polynomial fit from source (pixel, line) to destination
/// (x, y), in all terms of total degree <= order of the source coordinates
/// centred on their mean and scaled to [-1, 1].
/// Order rule: *order is the requested degree, first limited to 0..
/// kGeoMaxOrder, then lowered to the highest degree whose term count
/// (order + 1)(order + 2) / 2 does not exceed count (so 1 or 2 points give a
/// constant, 3 to 5 an affine map, 6 to 9 a quadratic), and written back; a
/// null order asks for kGeoMaxOrder. Terms the points leave undetermined
/// (all points on one line, say) come out zero. rmsX/rmsY (may be null)
/// receive the root-mean-square residuals. flags is reserved. Returns 0 on
/// success, non-zero (geo untouched) for no points, null arrays or
/// non-finite values.
int32_t GCPRegression2(GEOInfo_t *geo, const char *srcGeosys,
                       const double *srcX, const double *srcY,
                       const char *dstGeosys, const double *dstX,
                       const double *dstY, int32_t count, int32_t *order,
                       int32_t flags, double *rmsX, double *rmsY);
/// Evaluates a fit at (x, y); outputs are left as they are when geo is null
/// or does not hold a fit.
void GCPTransform(const GEOInfo_t *geo, double x, double y, double *outX,
                  double *outY);
