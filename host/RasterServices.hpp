#pragma once

#include "host/Ephemeris.hpp"
#include "host/ProjectionServices.hpp"

#include <cstdint>
#include <cstdio>

// Host raster handles are FILE*-typed pointers to host-owned objects, compared
// by address. Two kinds exist: a GeoTIFF image opened by the built-in reader,
// and a dataset of the registered driver (made by fpAlloc, answered through
// the driver's table).
//
// Channel type codes: 2 uint16, 3 int32, 4 float32, 5 int16, 6 uint8,
// 7 complex int16 packed in an int32 (in-phase in the low half),
// 8 uint32, 9 complex float32 pair.

enum ChannelTypeCode : int32_t {
    kChanUInt16 = 2,
    kChanInt32 = 3,
    kChanFloat32 = 4,
    kChanInt16 = 5,
    kChanUInt8 = 6,
    kChanComplexInt16 = 7,
    kChanUInt32 = 8,
    kChanComplexFloat32 = 9,
};

/// A new driver dataset handle carrying name (copied). kind and reserved are
/// the caller's tags (the driver passes 192 and null). Null on failure.
FILE *fpAlloc(const char *name, int32_t kind, void *reserved);
/// Releases a handle made by fpAlloc; unknown pointers are ignored.
void fpDealloc(FILE *fp);
/// The handle's name (owned by the handle), or null for an unknown handle.
const char *fp2filename(FILE *fp);

/// Stores the raster layout of a driver dataset.
void RawDefine(FILE *fp, int32_t width, int32_t height, int32_t channels,
               int32_t typeCode, int32_t reserved1, int32_t reserved2);
/// Forgets the layout stored by RawDefine.
void RawClose(FILE *fp);
/// The layout stored by RawDefine (zeros when none); null outputs are skipped.
void RawSizeInfo(FILE *fp, int32_t *width, int32_t *height, int32_t *channels);
/// The type code of a channel (1-based) as stored by RawDefine, 0 when none.
int32_t RawChanType(FILE *fp, int32_t channel);

/// Opens name for reading ("r", any case): a file starting with a TIFF
/// signature by the built-in GeoTIFF reader, anything else by the registered
/// driver. Names that are not regular files are refused without reading them.
/// On failure: null and a warning naming the file. Close with VXBClose.
FILE *VXBOpen(const char *name, const char *access);
/// Closes a handle from VXBOpen; null and unknown handles are ignored.
void VXBClose(FILE *fp);
int32_t VXBChanXSize(FILE *fp);
int32_t VXBChanYSize(FILE *fp);
int32_t VXBChanCount(FILE *fp);
int32_t VXBChanType(FILE *fp, int32_t channel);

/// Reads a window (xoff, yoff, xsize, ysize) resampled by nearest neighbour
/// to dstx x dsty into dst, pixel-interleaved over the nchan channels of
/// chanlist (1-based). Output column k comes from source column
/// xoff + floor(k * xsize / dstx); rows likewise. A bad window, size or
/// channel is reported as an error and nothing is written.
void VXBInt32ChanIO(FILE *fp, int32_t mode, int32_t xoff, int32_t yoff,
                    int32_t xsize, int32_t ysize, int32_t *dst, int32_t dstx,
                    int32_t dsty, int32_t nchan, const int32_t *chanlist);
void VXBReal32ChanIO(FILE *fp, int32_t mode, int32_t xoff, int32_t yoff,
                     int32_t xsize, int32_t ysize, float *dst, int32_t dstx,
                     int32_t dsty, int32_t nchan, const int32_t *chanlist);

/// The metadata list of an object (type 1 the dataset, 2 a channel) added to
/// list; returns the list to use from then on. mode must be 0 (read).
char **VXBMetaDataIO(FILE *fp, int32_t mode, int32_t objectType,
                     int32_t objectNumber, char **list);
/// Fills record with the handle's coordinate system and transform; returns
/// its DecodeGeosys code. A GeoTIFF without georeferencing gives "PIXEL".
int32_t VXBProjectionIO(FILE *fp, int32_t mode, ProjInfo_t *record);

/// Most points a GCP segment of a GeoTIFF hands out.
constexpr int32_t kMaxGcpSegmentPoints = 256;
/// The ground control points of segment `segment` (a GeoTIFF's tie points are
/// segment 1, thinned to kMaxGcpSegmentPoints by an even stride). The arrays
/// must hold kMaxGcpSegmentPoints entries; the texts are the pixel units (6
/// bytes), ground coordinate system (17), and the units of elevation and of
/// the ground positions (6 each). pixelHeights receives 0 for every point;
/// xs, ys, zs the ground positions. reserved is 1.
void VXBGcpIO(FILE *fp, int32_t mode, int32_t segment, int32_t reserved,
              int32_t *count, char *pixelUnits, char *groundGeosys,
              char *elevationUnits, char *groundUnits, int32_t *ids,
              double *pixels, double *lines, double *pixelHeights, double *xs,
              double *ys, double *zs);
/// Length in bytes of binary segment `segment` (a GeoTIFF's segment 1 is its
/// RPC model as an RF block, length 0 when the file has none).
int32_t VXBGetBinaryLength(FILE *fp, int32_t segment);
/// Copies length bytes from offset of binary segment `segment` into buffer.
void VXBBinaryIO(FILE *fp, int32_t mode, int32_t segment, int32_t offset,
                 int32_t length, unsigned char *buffer);

/// An orbit record built from the SatPositions (groups of seven fields: time,
/// x, y, z, vx, vy, vz, each followed by ';') and SatAttitudes (groups of
/// four: seconds of day, yaw, roll, pitch) entries of list. Throws
/// orv::DataException when SatPositions is absent, empty or malformed.
/// Release with VXBSatEphemerisFree.
EphemerisSeg_t *GetOrbitPtr(char *const *list, const ProjInfo_t *projection);
/// A deep copy with its own arrays; release with VXBSatEphemerisFree.
EphemerisSeg_t *VXBSatEphemerisDuplicate(const EphemerisSeg_t *record);
/// Releases the arrays and the record; null is allowed.
void VXBSatEphemerisFree(EphemerisSeg_t *record);
/// True when the entry pixelTimeOrdering is present; each flag is true when
/// lineTimeOrdering / pixelTimeOrdering reads "Decreasing".
bool GetSARFlippingParameters(char *const *list, bool *lineFlip,
                              bool *pixelFlip);

/// The sample formats VXBSampleLayout tells (the file's TIFF SampleFormat).
enum StoredSampleFormat : int32_t {
    kSamplesUnsigned = 1,
    kSamplesSigned = 2,
    kSamplesFloat = 3,
    kSamplesComplexInteger = 5,
};

/// How an image of the built-in GeoTIFF reader stores its samples, as its
/// file declares them, so that a caller can check an image before reading
/// it: TIFF SampleFormat (1 unsigned integer, 2 signed integer, 3 IEEE float,
/// 5 complex integer; a void format reads as 1), BitsPerSample (a complex
/// sample counts both halves: 32 for complex int16, 64 for complex int32) and
/// SamplesPerPixel (a complex sample counts once; VXBChanCount counts its two
/// halves). Returns false with zeros for a driver dataset or an unknown
/// handle. Null outputs are skipped.
bool VXBSampleLayout(FILE *fp, int32_t *sampleFormat, int32_t *bitsPerSample,
                     int32_t *samplesPerPixel);
