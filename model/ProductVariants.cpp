#include "model/ProductVariants.hpp"

#include "host/TextServices.hpp"
#include "model/ChannelLayouts.hpp"

#include <cmath>
#include <strings.h>

// Detected products: calibration squares the amplitude into power and
// applies the column's gain; there is no complex pair to combine.

void ZirOdi2GeoCorrected::CalibrateDetected(int32_t xOffset, int32_t,
                                            int32_t width, int32_t height,
                                            float *samples) {
    CalibrateDetectedSamples(CalibrationTable(), xOffset, width, height,
                             samples);
}

void ZirOdi2GeoCorrected::CombineComplex(const float *, const float *, int32_t,
                                         int32_t, float *) {}

void ZirOdi2GrndRangeP::CalibrateDetected(int32_t xOffset, int32_t,
                                          int32_t width, int32_t height,
                                          float *samples) {
    CalibrateDetectedSamples(CalibrationTable(), xOffset, width, height,
                             samples);
}

void ZirOdi2GrndRangeP::CombineComplex(const float *, const float *, int32_t,
                                       int32_t, float *) {}

// Single-look complex products: each of I and Q is divided by the gain, so
// that I * I + Q * Q is calibrated power.

void ZirOdi2SLC::CalibrateDetected(int32_t xOffset, int32_t, int32_t width,
                                   int32_t height, float *samples) {
    DivideByColumnGain(CalibrationTable(), xOffset, width, height, samples);
}

void ZirOdi2SLC::CombineComplex(const float *inPhase, const float *quadrature,
                                int32_t width, int32_t height, float *result) {
    if (inPhase == nullptr || quadrature == nullptr || result == nullptr ||
        width <= 0 || height <= 0)
        return;
    // Calibrated samples combine to power, raw ones to amplitude.
    const char *calibration = GetCalibrationType();
    bool power = calibration != nullptr && strcasecmp(calibration, "None") != 0;
    std::size_t count =
        static_cast<std::size_t>(width) * static_cast<std::size_t>(height);
    for (std::size_t k = 0; k < count; ++k) {
        float sum = inPhase[k] * inPhase[k] + quadrature[k] * quadrature[k];
        result[k] = power ? sum : std::sqrt(sum);
    }
}

char *ZirOdi2SLC::MatrixType() { return HString("s1c"); }

void ZirOdi2SLC::DefineChannels() {
    DefineSingleLayout(*this, Bands(), SampleKind::Complex);
}

char *ZirOdi2SLC::PolarizationText() { return BandNameList(Bands()); }

char *ZirOdi2SLCS2C::MatrixType() { return HString("s2c"); }

void ZirOdi2SLCS2C::DefineChannels() {
    DefineDualLayout(*this, SampleKind::Complex);
}

char *ZirOdi2SLCS2C::PolarizationText() { return DualPolarizationText(*this); }

char *ZirOdi2SLCS4C::MatrixType() { return HString("s4c"); }

void ZirOdi2SLCS4C::DefineChannels() {
    DefineQuadLayout(*this, SampleKind::Complex);
}

char *ZirOdi2SLCS4C::PolarizationText() { return QuadPolarizationText(); }

char *RUZ2GeocCR::MatrixType() { return HString("c1r"); }

void RUZ2GeocCR::DefineChannels() {
    DefineSingleLayout(*this, Bands(), SampleKind::Detected);
}

char *RUZ2GeocCR::PolarizationText() { return BandNameList(Bands()); }

char *RUZ2GeocC2R::MatrixType() { return HString("c2r"); }

void RUZ2GeocC2R::DefineChannels() {
    DefineDualLayout(*this, SampleKind::Detected);
}

char *RUZ2GeocC2R::PolarizationText() { return DualPolarizationText(*this); }

char *RUZ2GeocC4R::MatrixType() { return HString("c4r"); }

void RUZ2GeocC4R::DefineChannels() {
    DefineQuadLayout(*this, SampleKind::Detected);
}

char *RUZ2GeocC4R::PolarizationText() { return QuadPolarizationText(); }

char *RUZ2GrpcCR::MatrixType() { return HString("c1r"); }

void RUZ2GrpcCR::DefineChannels() {
    DefineSingleLayout(*this, Bands(), SampleKind::Detected);
}

char *RUZ2GrpcCR::PolarizationText() { return BandNameList(Bands()); }

char *RUZ2GrpC2R::MatrixType() { return HString("c2r"); }

void RUZ2GrpC2R::DefineChannels() {
    DefineDualLayout(*this, SampleKind::Detected);
}

char *RUZ2GrpC2R::PolarizationText() { return DualPolarizationText(*this); }

char *RUZ2GrpC4R::MatrixType() { return HString("c4r"); }

void RUZ2GrpC4R::DefineChannels() {
    DefineQuadLayout(*this, SampleKind::Detected);
}

char *RUZ2GrpC4R::PolarizationText() { return QuadPolarizationText(); }
