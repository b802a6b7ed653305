#pragma once

#include "model/ZirOdi2CalibImage.hpp"

/// Geocoded detected products (SSG, SPG).
class ZirOdi2GeoCorrected : public ZirOdi2CalibImage {
  public:
    void CalibrateDetected(int32_t xOffset, int32_t yOffset, int32_t width,
                           int32_t height, float *samples) override;
    void CombineComplex(const float *inPhase, const float *quadrature,
                        int32_t width, int32_t height, float *result) override;
};

/// Ground-range detected products (SGX, SGF, SGC, SCN, SCW).
class ZirOdi2GrndRangeP : public ZirOdi2CalibImage {
  public:
    void CalibrateDetected(int32_t xOffset, int32_t yOffset, int32_t width,
                           int32_t height, float *samples) override;
    void CombineComplex(const float *inPhase, const float *quadrature,
                        int32_t width, int32_t height, float *result) override;
};

/// Single-look complex products with one image file.
class ZirOdi2SLC : public ZirOdi2CalibImage {
  public:
    void CalibrateDetected(int32_t xOffset, int32_t yOffset, int32_t width,
                           int32_t height, float *samples) override;
    void CombineComplex(const float *inPhase, const float *quadrature,
                        int32_t width, int32_t height, float *result) override;
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};

class ZirOdi2SLCS2C : public ZirOdi2SLC {
  public:
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};

class ZirOdi2SLCS4C : public ZirOdi2SLC {
  public:
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};

class RUZ2GeocCR : public ZirOdi2GeoCorrected {
  public:
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};

class RUZ2GeocC2R : public ZirOdi2GeoCorrected {
  public:
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};

class RUZ2GeocC4R : public ZirOdi2GeoCorrected {
  public:
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};

class RUZ2GrpcCR : public ZirOdi2GrndRangeP {
  public:
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};

class RUZ2GrpC2R : public ZirOdi2GrndRangeP {
  public:
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};

class RUZ2GrpC4R : public ZirOdi2GrndRangeP {
  public:
    char *MatrixType() override;
    void DefineChannels() override;
    char *PolarizationText() override;
};
