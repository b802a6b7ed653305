#include "tools/rs2/ExportRpc.hpp"

#include "host/ModelSegments.hpp"

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>

namespace {

struct RecordDeleter {
    void operator()(RFInfo_t *record) const { RFDeallocate(record); }
};
using RecordKeeper = std::unique_ptr<RFInfo_t, RecordDeleter>;

// The model states no error estimate.
constexpr double kUnknownError = -1.0;

// The 20 terms of a cubic in normalised longitude L, latitude P and height
// H, in the order the coefficients follow: 1, L, P, H, LP, LH, PH, L^2, P^2,
// H^2, PLH, L^3, LP^2, LH^2, L^2P, P^3, PH^2, L^2H, P^2H, H^3.
std::array<double, kRFBlockCoefficients> CubicTerms(double l, double p,
                                                    double h) {
    return {1.0,       l,         p,         h,         l * p,
            l * h,     p * h,     l * l,     p * p,     h * h,
            p * l * h, l * l * l, l * p * p, l * h * h, l * l * p,
            p * p * p, p * h * h, l * l * h, p * p * h, h * h * h};
}

double Ratio(const double *numerator, const double *denominator,
             const std::array<double, kRFBlockCoefficients> &terms) {
    double top = 0.0, bottom = 0.0;
    for (size_t i = 0; i < terms.size(); ++i) {
        top += numerator[i] * terms[i];
        bottom += denominator[i] * terms[i];
    }
    return top / bottom;
}

// The model's image position of a grid point: pixel and line counted from
// 0 at the centre of the first pixel.
std::array<double, 2> Project(const RFInfo_t &m, const GridTiePoint &point) {
    const auto terms =
        CubicTerms((point.longitude - m.longitudeOffset) / m.longitudeScale,
                   (point.latitude - m.latitudeOffset) / m.latitudeScale,
                   (point.height - m.heightOffset) / m.heightScale);
    return {Ratio(m.pixelNumeratorCoefficients, m.pixelDenominatorCoefficients,
                  terms) *
                    m.pixelScale +
                m.pixelOffset,
            Ratio(m.lineNumeratorCoefficients, m.lineDenominatorCoefficients,
                  terms) *
                    m.lineScale +
                m.lineOffset};
}

bool AgreesWithGrid(const RFInfo_t &model,
                    const std::vector<GridTiePoint> &grid,
                    const ExportPlan &plan) {
    if (grid.empty())
        return false;
    return std::all_of(grid.begin(), grid.end(), [&](const GridTiePoint &p) {
        const auto [pixel, line] = Project(model, p);
        // Grid positions are pixel-is-area, the model's count from centres.
        const double misplacement =
            std::hypot((pixel + 0.5 - p.pixel) / plan.ColumnStep(),
                       (line + 0.5 - p.line) / plan.LineStep());
        return misplacement <= 0.5; // false for a NaN too
    });
}

// An offset of the model's image positions (centre of the first pixel at 0)
// in the output grid: position p of the dataset lies at
// (p + 0.5 - origin) / step - 0.5 there.
double OutputOffset(double offset, double origin, double step) {
    return (offset + 0.5 - origin) / step - 0.5;
}

} // namespace

std::vector<double> OutputRpcCoefficients(const host::Raster &raster,
                                          const std::vector<GridTiePoint> &grid,
                                          const ExportPlan &plan) {
    const std::vector<unsigned char> block = raster.BinarySegment();
    const RecordKeeper model(
        VXBBinaryToRFInfo(block.data(), static_cast<int32_t>(block.size())));
    if (!model || !AgreesWithGrid(*model, grid, plan))
        return {};
    const RFInfo_t &m = *model;
    std::vector<double> values = {
        kUnknownError,
        kUnknownError,
        OutputOffset(m.lineOffset, plan.window.y, plan.LineStep()),
        OutputOffset(m.pixelOffset, plan.window.x, plan.ColumnStep()),
        m.latitudeOffset,
        m.longitudeOffset,
        m.heightOffset,
        m.lineScale / plan.LineStep(),
        m.pixelScale / plan.ColumnStep(),
        m.latitudeScale,
        m.longitudeScale,
        m.heightScale};
    for (const double *polynomial :
         {m.lineNumeratorCoefficients, m.lineDenominatorCoefficients,
          m.pixelNumeratorCoefficients, m.pixelDenominatorCoefficients})
        values.insert(values.end(), polynomial,
                      polynomial + kRFBlockCoefficients);
    if (!std::all_of(values.begin(), values.end(),
                     [](double v) { return std::isfinite(v); }))
        return {};
    return values;
}
