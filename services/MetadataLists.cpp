#include "services/MetadataLists.hpp"

#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "model/ProductTypes.hpp"
#include "model/ZirOdi2CalibImage.hpp"
#include "product/StringListKeeper.hpp"

#include <cstdlib>

#include <strings.h>

namespace {

bool SameText(const char *text, const char *other) {
    return text != nullptr && strcasecmp(text, other) == 0;
}

char **AppendEntry(char **list, const char *key, const char *value) {
    return AddStringToList(list, MakeAuxEntry(key, value));
}

// A calibration that converts samples to backscatter, as opposed to the
// image values as stored.
bool IsCalibrated(const char *calibrationType) {
    return calibrationType != nullptr && !SameText(calibrationType, "None");
}

// The product of the two look counts, when both are real counts.
double LookProduct(const char *rangeLooks, const char *azimuthLooks) {
    double range = rangeLooks != nullptr ? std::atof(rangeLooks) : 0.0;
    double azimuth = azimuthLooks != nullptr ? std::atof(azimuthLooks) : 0.0;
    return range > 0.0 && azimuth > 0.0 ? range * azimuth : 0.0;
}

} // namespace

char *ProductTypeName(int32_t productType) {
    static const char *const names[] = {"SLC", "SGX", "SGF", "SGC",
                                        "SCN", "SCW", "SSG", "SPG"};
    constexpr int32_t count = sizeof(names) / sizeof(names[0]);
    return HString(productType >= 0 && productType < count ? names[productType]
                                                           : "UNKNOWN");
}

char *CalibrationShortName(const char *calibrationType) {
    static const struct {
        const char *type;
        const char *shortName;
    } names[] = {{"Beta Nought", "Beta0"},
                 {"Sigma Nought", "Sigma0"},
                 {"Gamma", "Gamma"},
                 {"None", "None"}};
    for (const auto &name : names) {
        if (SameText(calibrationType, name.type))
            return HString(name.shortName);
    }
    return nullptr;
}

char **ZirOdi2CalibImage::FileMetadata(char **list) {
    list = AppendEntry(list, "SensorModelName", "RADARSAT_2");
    list = AppendEntry(list, "SensorType", "SAR");
    list = AppendEntry(list, "SensorCode", "SAR");
    HostText typeName(ProductTypeName(productType));
    list = AppendEntry(list, "ProductType", typeName.get());
    HostText matrixType(MatrixType());
    list = AppendEntry(list, "Matrix_Type", matrixType.get());
    if (calibrationType != nullptr) {
        HostText shortName(CalibrationShortName(calibrationType));
        if (shortName)
            list = AppendEntry(list, "SAR_Calibration", shortName.get());
    }
    list = AppendEntry(list, "RadarBand", "C");
    HostText polarizations(PolarizationText());
    list = AppendEntry(list, "Polarizations", polarizations.get());
    list = AppendEntry(list, "NumRangeLooks", rangeLooks);
    list = AppendEntry(list, "NumAzimuthLooks", azimuthLooks);
    double looks = LookProduct(rangeLooks, azimuthLooks);
    if (looks > 0.0)
        list = SetAuxEntry(list, "NumLooks", MkName("%g", looks));
    list = AddStringList(list, metadata);

    // Colour composites the host shows by default: a quad product as
    // HH, HV, VV; a dual product with a co- and a cross-polarized image as
    // co, cross, co.
    bool quad =
        SameText(matrixType.get(), "c4r") || SameText(matrixType.get(), "s4c");
    bool dual =
        SameText(matrixType.get(), "c2r") || SameText(matrixType.get(), "s2c");
    bool coAndCross =
        (FindBand(static_cast<int32_t>(Polarization::HH)) != nullptr &&
         FindBand(static_cast<int32_t>(Polarization::HV)) != nullptr) ||
        (FindBand(static_cast<int32_t>(Polarization::VV)) != nullptr &&
         FindBand(static_cast<int32_t>(Polarization::VH)) != nullptr);
    if (quad || (dual && coAndCross)) {
        list = SetAuxEntry(list, "DefaultRed", "1");
        list = SetAuxEntry(list, "DefaultGreen", "2");
        list = SetAuxEntry(list, "DefaultBlue", quad ? "4" : "1");
    }
    return list;
}

char **ZirOdi2CalibImage::ChannelMetadata(int32_t channel, char **list) {
    EnsureChannels();
    const ChannelRecord *record = FindChannel(channel);
    if (record == nullptr)
        return list;
    if (record->description != nullptr) {
        // The description already reads as an entry ("Matrix_Element: _1_1").
        list = AddStringToList(list, record->description);
        list = AppendEntry(list, "Scale", "linear");
    }
    if (record->band != nullptr)
        list = SetAuxEntry(list, "Polarization",
                           PolarizationName(record->band->polarization));
    return list;
}

char **ZirOdi2CalibImage::IncidenceAngleMetadata(char **list) {
    return AppendEntry(list, "IncidenceAngle", "vector");
}

// A channel with no record or no image file has nothing to describe, so it
// gets an empty text.
const char *ZirOdi2CalibImage::ChannelDescription(int32_t channel) {
    const ChannelRecord *record = FindChannel(channel);
    if (record == nullptr || record->band == nullptr)
        return "";
    const char *polarization = PolarizationName(record->band->polarization);
    if (record->kind == static_cast<int32_t>(SampleKind::Detected))
        return MkName(_("%s detected data"), polarization);
    if (IsCalibrated(calibrationType))
        return MkName(_("%s %s Complex"), polarization, calibrationType);
    return MkName(_("%s Uncalibrated Complex"), polarization);
}

const char *ZirOdi2CalibImage::ProductTypeEntry() const {
    HostText name(ProductTypeName(productType));
    return MakeAuxEntry("ProductType", name.get());
}
