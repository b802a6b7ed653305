#pragma once

#include "model/LookupTable.hpp"
#include "model/ProductTypes.hpp"
#include "model/ZirOdi2CalibImage.hpp"

#include <cstdint>
#include <map>

// The channel layouts, polarization texts and sample arithmetic that the
// product variants share: a geocoded and a ground-range class of the same
// polarization count present their channels alike, and the complex classes
// differ from them only in sample kind and matrix element names.

/// Channel 1 of a single-image product: the polarization of the first band,
/// named after the first present of HH, HV, VH, VV.
void DefineSingleLayout(ZirOdi2CalibImage &model,
                        const std::map<int32_t, BandRecord *> &bands,
                        SampleKind kind);
/// Two channels: HH and VV, else HH and HV, else VV and VH.
void DefineDualLayout(ZirOdi2CalibImage &model, SampleKind kind);
/// Four channels: HH, HV, VH, VV, whether or not each has an image.
void DefineQuadLayout(ZirOdi2CalibImage &model, SampleKind kind);

/// The names of the bands in code order, run together ("HHHV"); a new host
/// string the caller frees.
char *BandNameList(const std::map<int32_t, BandRecord *> &bands);
/// The pair DefineDualLayout chooses, as "HH, VV", "HH, HV" or "VV, VH"; a
/// new host string the caller frees.
char *DualPolarizationText(const ZirOdi2CalibImage &model);
/// "HH, HV, VH, VV" as a new host string the caller frees.
char *QuadPolarizationText();

/// Detected samples to calibrated values: (s * s + offset) / gain, with the
/// gain of each sample's product column (window column plus xOffset).
/// Gains are taken as the table gives them, in IEEE arithmetic: a zero gain
/// makes the value infinite (not a number when s * s + offset is 0 too), a
/// negative gain flips its sign. A table file with tokens that hold no
/// number ends in zero gains (its reader packs the numbers from entry 0), so
/// such damage shows as infinities in the last columns.
void CalibrateDetectedSamples(const LookupTable &table, int32_t xOffset,
                              int32_t width, int32_t height, float *samples);
/// Complex samples divided by the gain of their product column; a zero gain
/// gives infinities (not a number for a zero sample), as above.
void DivideByColumnGain(const LookupTable &table, int32_t xOffset,
                        int32_t width, int32_t height, float *samples);
