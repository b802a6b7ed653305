#pragma once

#include <cstdint>

// The codes are stored as 32-bit integers in the model; their values are
// fixed because they order bands and select classes.

enum class ProductType : int32_t {
    SLC = 0,
    SGX = 1,
    SGF = 2,
    SGC = 3,
    SCN = 4,
    SCW = 5,
    SSG = 6,
    SPG = 7,
    Unknown = 8,
};

enum class AcquisitionType : int32_t {
    Standard = 0,
    Wide = 1,
    Fine = 2,
    MultiLookFine = 3,
    Ultrafine = 4,
    LowIncidence = 5,
    HighIncidence = 6,
    StandardQuadPolarization = 7,
    FineQuadPolarization = 8,
    ScanSARNarrow = 9,
    ScanSARWide = 10,
    Unknown = 11,
};

/// VH is 1 and HV is 2: the codes fix the order in which bands are listed.
enum class Polarization : int32_t {
    HH = 0,
    VH = 1,
    HV = 2,
    VV = 3,
    Unknown = 4,
};

enum class SampleKind : int32_t {
    Detected = 0, // one real sample per pixel
    Complex = 2,  // an in-phase/quadrature pair per pixel
};

/// Name of a Polarization code ("HH", "VH", "HV", "VV", else "Unknown"); a
/// static text, never freed.
const char *PolarizationName(int32_t polarization);
