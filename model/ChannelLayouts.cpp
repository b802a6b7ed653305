#include "model/ChannelLayouts.hpp"

#include "host/TextServices.hpp"

#include <limits>
#include <string>
#include <utility>
#include <vector>

// Calibration divides by gains a product file gives, zero among them; only
// IEEE floats make that division defined (an infinity or not a number).
static_assert(std::numeric_limits<float>::is_iec559,
              "calibration needs IEEE float division");

namespace {

constexpr Polarization kSuffixSearchOrder[] = {
    Polarization::HH, Polarization::HV, Polarization::VH, Polarization::VV};

int32_t Code(Polarization polarization) {
    return static_cast<int32_t>(polarization);
}

bool IsPresent(const ZirOdi2CalibImage &model, Polarization polarization) {
    return model.FindBand(Code(polarization)) != nullptr;
}

// The element of the scattering matrix a polarization stands for. Complex
// products present the 2 x 2 scattering matrix itself; detected products
// present the diagonal of the 4 x 4 covariance matrix.
const char *MatrixElementSuffix(Polarization polarization, SampleKind kind) {
    bool complex = kind == SampleKind::Complex;
    switch (polarization) {
    case Polarization::HH:
        return "_1_1";
    case Polarization::HV:
        return complex ? "_1_2" : "_2_2";
    case Polarization::VH:
        return complex ? "_2_1" : "_3_3";
    case Polarization::VV:
        return complex ? "_2_2" : "_4_4";
    case Polarization::Unknown:
        break;
    }
    return "";
}

void AddChannel(ZirOdi2CalibImage &model, int32_t number,
                Polarization polarization, const char *suffix,
                SampleKind kind) {
    const char *description = MkName("%s: %s", "Matrix_Element", suffix);
    model.SetChannel(number, model.NewChannel(Code(polarization), description,
                                              1, static_cast<int32_t>(kind)));
}

void AddChannel(ZirOdi2CalibImage &model, int32_t number,
                Polarization polarization, SampleKind kind) {
    AddChannel(model, number, polarization,
               MatrixElementSuffix(polarization, kind), kind);
}

// The two polarizations a dual-polarization product presents: co- and
// cross-polarized of the HH transmit chain when it has them, else those of
// the VV chain.
std::pair<Polarization, Polarization> DualPair(const ZirOdi2CalibImage &model) {
    if (IsPresent(model, Polarization::HH) &&
        IsPresent(model, Polarization::VV))
        return {Polarization::HH, Polarization::VV};
    if (IsPresent(model, Polarization::HH) &&
        IsPresent(model, Polarization::HV))
        return {Polarization::HH, Polarization::HV};
    return {Polarization::VV, Polarization::VH};
}

// The gain of product column index; columns before the first have no entry
// and take the neutral gain, as those past the last do.
float ColumnGain(const LookupTable &table, int64_t index) {
    return index >= 0 ? table.Get(static_cast<std::size_t>(index)) : 1.0f;
}

// Applies convert(sample, gain) to every sample of a row-major plane, the
// gain being that of the sample's product column.
template <class Convert>
void ForEachSampleWithGain(const LookupTable &table, int32_t xOffset,
                           int32_t width, int32_t height, float *samples,
                           Convert convert) {
    if (samples == nullptr || width <= 0 || height <= 0)
        return;
    // Gains first, then the plane row by row in memory order, which the
    // compiler turns into vector arithmetic.
    const auto stride = static_cast<std::size_t>(width);
    std::vector<float> gains(stride);
    for (int32_t c = 0; c < width; ++c)
        gains[static_cast<std::size_t>(c)] =
            ColumnGain(table, static_cast<int64_t>(xOffset) + c);
    for (int32_t r = 0; r < height; ++r) {
        float *row = samples + static_cast<std::size_t>(r) * stride;
        for (std::size_t c = 0; c < stride; ++c)
            row[c] = convert(row[c], gains[c]);
    }
}

} // namespace

void DefineSingleLayout(ZirOdi2CalibImage &model,
                        const std::map<int32_t, BandRecord *> &bands,
                        SampleKind kind) {
    // Without any band the channel shows no polarization and has no image.
    auto polarization = bands.empty()
                            ? Polarization::Unknown
                            : static_cast<Polarization>(bands.begin()->first);
    const char *suffix = "";
    for (Polarization candidate : kSuffixSearchOrder) {
        if (IsPresent(model, candidate)) {
            suffix = MatrixElementSuffix(candidate, kind);
            break;
        }
    }
    AddChannel(model, 1, polarization, suffix, kind);
}

void DefineDualLayout(ZirOdi2CalibImage &model, SampleKind kind) {
    auto pair = DualPair(model);
    AddChannel(model, 1, pair.first, kind);
    AddChannel(model, 2, pair.second, kind);
}

void DefineQuadLayout(ZirOdi2CalibImage &model, SampleKind kind) {
    AddChannel(model, 1, Polarization::HH, kind);
    AddChannel(model, 2, Polarization::HV, kind);
    AddChannel(model, 3, Polarization::VH, kind);
    AddChannel(model, 4, Polarization::VV, kind);
}

char *BandNameList(const std::map<int32_t, BandRecord *> &bands) {
    std::string names;
    for (const auto &entry : bands)
        names += PolarizationName(entry.first);
    return HString(names.c_str());
}

char *DualPolarizationText(const ZirOdi2CalibImage &model) {
    auto pair = DualPair(model);
    return HString(MkName("%s, %s", PolarizationName(Code(pair.first)),
                          PolarizationName(Code(pair.second))));
}

char *QuadPolarizationText() { return HString("HH, HV, VH, VV"); }

void CalibrateDetectedSamples(const LookupTable &table, int32_t xOffset,
                              int32_t width, int32_t height, float *samples) {
    const float offset = table.Offset();
    ForEachSampleWithGain(
        table, xOffset, width, height, samples,
        [offset](float s, float gain) { return (s * s + offset) / gain; });
}

void DivideByColumnGain(const LookupTable &table, int32_t xOffset,
                        int32_t width, int32_t height, float *samples) {
    ForEachSampleWithGain(table, xOffset, width, height, samples,
                          [](float s, float gain) { return s / gain; });
}
