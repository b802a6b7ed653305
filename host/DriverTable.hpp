#pragma once

#include "host/Ephemeris.hpp"
#include "host/ProjectionServices.hpp"

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <string>

/// The host's cursor over a text segment.
struct TextCursor {
    int32_t status;
    FILE *handle;
    int32_t value;
    int64_t position;
    int64_t hostData; // the host's own; drivers leave it alone
    int32_t lineIndex;
};

// Signatures of the driver operations.
using RawSizeInfoFn = void (*)(FILE *, int32_t *, int32_t *, int32_t *);
using RawChanTypeFn = int32_t (*)(FILE *, int32_t);
using IntegerChannelReadFn = void (*)(FILE *, int32_t, int32_t, int32_t,
                                      int32_t, int32_t, int32_t *, int32_t,
                                      int32_t, int32_t, const int32_t *);
using RealChannelReadFn = void (*)(FILE *, int32_t, int32_t, int32_t, int32_t,
                                   int32_t, float *, int32_t, int32_t, int32_t,
                                   const int32_t *);
using DescribeChannelFn = int32_t (*)(FILE *, int32_t, int32_t, char *);
using CloseDatasetFn = void (*)(FILE *);
using OpenDatasetFn = FILE *(*)(const char *, const char *);
using DescribeObjectFn = void (*)(FILE *, int32_t, int32_t, int32_t, char *);
using FindSegmentFn = int32_t (*)(FILE *, int32_t, int32_t);
using OpenTextSegmentFn = int32_t (*)(FILE *, TextCursor *, const char *,
                                      int32_t);
using ReadTextLineFn = int32_t (*)(TextCursor *, char *, int32_t);
using ReadProjectionFn = int32_t (*)(FILE *, int32_t, ProjInfo_t *);
using ReadGcpSegmentFn = void (*)(FILE *, int32_t, int32_t, int32_t *, char *,
                                  char *, char *, char *, int32_t *, double *,
                                  double *, double *, double *, double *,
                                  double *);
using ReadMetadataFn = char **(*)(FILE *, int32_t, int32_t, int32_t, char **);
using ReadOrbitSegmentFn = void (*)(FILE *, int32_t, int32_t, EphemerisSeg_t *);
using ReadBinarySegmentFn = void (*)(FILE *, int32_t, int32_t, int32_t, int32_t,
                                     unsigned char *);
using BinarySegmentLengthFn = int32_t (*)(FILE *, int32_t);
using IncidenceArraySegmentFn = void (*)(FILE *, int32_t, int32_t, int32_t *,
                                         int32_t *, double **, char *);
using ListCalibrationTypesFn = char **(*)(const char *);
using NormalizeDatasetNameFn = char *(*)(const char *);
using ListImageFilesFn = char **(*)(FILE *);
using BrowseImageFileFn = std::string (*)(FILE *);
using ListAuxiliaryFilesFn = char **(*)(FILE *);

/// The host's table of driver operations: 8-byte entries at fixed byte
/// offsets. Entries a driver does not fill stay null and are never called.
struct DriverTable {
    RawSizeInfoFn RawSizeInfo;                     // 0
    void *reserved8[3];                            // 8
    RawChanTypeFn RawChanType;                     // 32
    void *reserved40[2];                           // 40
    IntegerChannelReadFn IntegerChannelRead;       // 56
    void *reserved64;                              // 64
    RealChannelReadFn RealChannelRead;             // 72
    void *reserved80[6];                           // 80
    DescribeChannelFn DescribeChannel;             // 128
    CloseDatasetFn CloseDataset;                   // 136
    OpenDatasetFn OpenDataset;                     // 144
    void *reserved152[4];                          // 152
    DescribeObjectFn DescribeObject;               // 184
    void *reserved192[2];                          // 192
    FindSegmentFn FindSegment;                     // 208
    void *reserved216[7];                          // 216
    OpenTextSegmentFn OpenTextSegment;             // 272
    ReadTextLineFn ReadTextLine;                   // 280
    void *reserved288[5];                          // 288
    ReadProjectionFn ReadProjection;               // 328
    void *reserved336[8];                          // 336
    ReadGcpSegmentFn ReadGcpSegment;               // 400
    void *reserved408[50];                         // 408
    ReadMetadataFn ReadMetadata;                   // 808
    void *reserved816[12];                         // 816
    ReadOrbitSegmentFn ReadOrbitSegment;           // 912
    ReadBinarySegmentFn ReadBinarySegment;         // 920
    BinarySegmentLengthFn BinarySegmentLength;     // 928
    void *reserved936;                             // 936
    IncidenceArraySegmentFn IncidenceArraySegment; // 944
    void *reserved952[3];                          // 952
    ListCalibrationTypesFn ListCalibrationTypes;   // 976
    void *reserved984[8];                          // 984
    NormalizeDatasetNameFn NormalizeDatasetName;   // 1048
    void *reserved1056[7];                         // 1056
    ListImageFilesFn ListImageFiles;               // 1112
    BrowseImageFileFn BrowseImageFile;             // 1120
    ListAuxiliaryFilesFn ListAuxiliaryFiles;       // 1128
};

static_assert(offsetof(DriverTable, RawSizeInfo) == 0);
static_assert(offsetof(DriverTable, RawChanType) == 32);
static_assert(offsetof(DriverTable, IntegerChannelRead) == 56);
static_assert(offsetof(DriverTable, RealChannelRead) == 72);
static_assert(offsetof(DriverTable, DescribeChannel) == 128);
static_assert(offsetof(DriverTable, CloseDataset) == 136);
static_assert(offsetof(DriverTable, OpenDataset) == 144);
static_assert(offsetof(DriverTable, DescribeObject) == 184);
static_assert(offsetof(DriverTable, FindSegment) == 208);
static_assert(offsetof(DriverTable, OpenTextSegment) == 272);
static_assert(offsetof(DriverTable, ReadTextLine) == 280);
static_assert(offsetof(DriverTable, ReadProjection) == 328);
static_assert(offsetof(DriverTable, ReadGcpSegment) == 400);
static_assert(offsetof(DriverTable, ReadMetadata) == 808);
static_assert(offsetof(DriverTable, ReadOrbitSegment) == 912);
static_assert(offsetof(DriverTable, ReadBinarySegment) == 920);
static_assert(offsetof(DriverTable, BinarySegmentLength) == 928);
static_assert(offsetof(DriverTable, IncidenceArraySegment) == 944);
static_assert(offsetof(DriverTable, ListCalibrationTypes) == 976);
static_assert(offsetof(DriverTable, NormalizeDatasetName) == 1048);
static_assert(offsetof(DriverTable, ListImageFiles) == 1112);
static_assert(offsetof(DriverTable, BrowseImageFile) == 1120);
static_assert(offsetof(DriverTable, ListAuxiliaryFiles) == 1128);
static_assert(sizeof(DriverTable) == 1136);

/// The registrar a driver module exports.
using DriverRegistrarFn = void (*)(DriverTable *);
constexpr const char *kDriverRegistrarName = "REZADE2DODOZavazozi";
