#pragma once

#include "host/ProjectionServices.hpp"

#include <cstdint>

// An RF block is the portable form of an RFInfo_t: kRFBlockSize bytes,
// little-endian whatever the machine, every number written byte by byte.
//
//   offset  size  content
//        0     8  magic "RFMODEL1" (no terminating zero)
//        8     4  int32 layout version (1)
//       12     4  int32 width in pixels
//       16     4  int32 height in lines
//       20     4  zero (keeps the doubles 8-byte aligned)
//       24    80  10 doubles: longitude offset, longitude scale, latitude
//                 offset, latitude scale, height offset, height scale, pixel
//                 offset, pixel scale, line offset, line scale
//      104   160  20 doubles: pixel numerator coefficients
//      264   160  20 doubles: pixel denominator coefficients
//      424   160  20 doubles: line numerator coefficients
//      584   160  20 doubles: line denominator coefficients
//      744    64  sensor name, zero-padded
//      808    17  coordinate-system text of the ground coordinates
//      825    17  projection record: coordinate-system text
//      842     6  zero
//      848    48  projection record: 6 transform doubles (GDAL order)
//      896   136  projection record: 17 parameter doubles
//     1032  2552  zero
//
// A record holding fewer than kRFBlockCoefficients coefficients per
// polynomial is written with zeros after its own; one holding more is cut to
// the first kRFBlockCoefficients. Decoding always gives records with
// kRFBlockCoefficients coefficients per polynomial. Texts keep at most their
// field size less one byte, so that decoded texts are always terminated.

/// Size in bytes of a serialised RF block (7 records of 512 bytes).
constexpr int32_t kRFBlockSize = 3584;
/// Room for the sensor name, terminating zero included.
constexpr int kRFSensorNameSize = 64;
/// Coefficients per polynomial an RF block holds (a cubic in three variables).
constexpr int32_t kRFBlockCoefficients = 20;

/// A rational function (RPC) model: image line and pixel as ratios of cubic
/// polynomials of normalised latitude, longitude and height.
struct RFInfo_t {
    int32_t coefficientCount; // room in each coefficient array
    int32_t width;            // image width in pixels
    int32_t height;           // image height in lines
    double *pixelNumeratorCoefficients;
    double *pixelDenominatorCoefficients;
    double *lineNumeratorCoefficients;
    double *lineDenominatorCoefficients;
    double longitudeOffset;
    double longitudeScale;
    double latitudeOffset;
    double latitudeScale;
    double heightOffset;
    double heightScale;
    double pixelOffset;
    double pixelScale;
    double lineOffset;
    double lineScale;
    char *sensorName; // kRFSensorNameSize bytes
    char *geosys;     // kGeosysTextSize bytes
    ProjInfo_t *projection;
};

/// A new record with count coefficients per polynomial, all zero, scales 1,
/// offsets and size 0, an empty sensor name, ground coordinates "LONG D000"
/// (the polynomials take longitude and latitude) and a projection record as
/// InitProjInfo sets it. Null when count <= 0 or memory runs out. The first
/// argument is reserved (null). Release with RFDeallocate.
RFInfo_t *RFAllocate(void *reserved, int32_t count);
/// Releases the record and everything it points to; null is allowed.
void RFDeallocate(RFInfo_t *record);
/// The record as a little-endian RF block of kRFBlockSize bytes; *length
/// (may be null) receives the size, 0 on failure. Null when record is null or
/// memory runs out. The caller frees the block with free().
unsigned char *VXBRFInfoToBinary(const RFInfo_t *record, int32_t *length);
/// Decodes an RF block into a new record: null when the block is null,
/// shorter than kRFBlockSize, or carries another magic or version. Release
/// the record with RFDeallocate.
RFInfo_t *VXBBinaryToRFInfo(const unsigned char *block, int32_t length);
