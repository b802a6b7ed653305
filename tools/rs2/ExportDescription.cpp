#include "tools/rs2/ExportDescription.hpp"

#include "tools/rs2/DatasetChoice.hpp"

#include <string>
#include <utility>

namespace {

// Items of the file taken from the dataset's metadata, by the name GIS users
// see and the key the driver gives; a key the dataset lacks is left out.
const std::pair<const char *, const char *> kDatasetItems[] = {
    {"PRODUCT_ID", "productId"},
    {"PRODUCT_TYPE", "ProductType"},
    {"SATELLITE", "PlatformName"},
    {"BEAM_MODE", "BeamMode"},
    {"FIRST_LINE_TIME", "TimeOfFirstLine"},
    {"PASS_DIRECTION", "passDirection"},
};

// Float channels are calibrated; integer ones are the product's digital
// numbers, and their power (a backscatter export) is in squared numbers.
std::string Units(const ExportPlan &plan) {
    if (plan.decibels)
        return "dB";
    if (plan.ReadsReals())
        return "linear";
    return plan.backscatter ? "DN^2" : "DN";
}

} // namespace

host::GeoTiffDescription DescribeExport(const host::Raster &raster,
                                        const ExportPlan &plan) {
    host::GeoTiffDescription description;
    for (const auto &[item, key] : kDatasetItems) {
        const std::string value = MetadataValue(raster, key);
        if (!value.empty())
            description.items.emplace_back(item, value);
    }
    const std::string calibration = MetadataValue(raster, "SAR_Calibration");
    description.items.emplace_back("CALIBRATION",
                                   calibration.empty() ? "None" : calibration);
    description.items.emplace_back("UNITS", Units(plan));
    for (const int32_t channel : plan.channels) {
        std::string polarization;
        for (const auto &[key, value] : raster.Metadata(2, channel))
            if (key == "Polarization")
                polarization = value;
        host::GeoTiffDescription::Band band{polarization, {}};
        if (!polarization.empty())
            band.items.emplace_back("POLARIZATION", polarization);
        description.bands.push_back(std::move(band));
    }
    // dB of power that is zero or negative (possible after --denoise) is
    // NaN: the one value of an export that stands for no data.
    if (plan.decibels)
        description.noData = "nan";
    return description;
}
