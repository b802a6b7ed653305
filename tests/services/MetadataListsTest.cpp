#include "services/MetadataLists.hpp"

#include "host/StringLists.hpp"
#include "model/ProductTypes.hpp"
#include "model/ProductVariants.hpp"
#include "product/StringListKeeper.hpp"
#include "tests/support/HostLists.hpp"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace {

constexpr int32_t kHH = static_cast<int32_t>(Polarization::HH);
constexpr int32_t kVH = static_cast<int32_t>(Polarization::VH);
constexpr int32_t kHV = static_cast<int32_t>(Polarization::HV);
constexpr int32_t kVV = static_cast<int32_t>(Polarization::VV);

using rs2test::ListTexts;

void AddBands(ZirOdi2CalibImage &model, const std::vector<int32_t> &codes) {
    for (int32_t code : codes)
        model.AddBand(code, "image.tif");
}

using Factory = std::function<std::unique_ptr<ZirOdi2CalibImage>()>;

template <class Variant> Factory Of() {
    return [] { return std::make_unique<Variant>(); };
}

std::optional<std::string> FileEntry(ZirOdi2CalibImage &model,
                                     const char *key) {
    StringListKeeper list;
    list.Reset(model.FileMetadata(list.Release()));
    return rs2test::ListEntry(list.Get(), key);
}

TEST(MetadataLists, name_tables) {
    const std::pair<int32_t, const char *> productTypes[] = {
        {0, "SLC"}, {1, "SGX"}, {2, "SGF"}, {3, "SGC"},     {4, "SCN"},
        {5, "SCW"}, {6, "SSG"}, {7, "SPG"}, {8, "UNKNOWN"}, {-1, "UNKNOWN"}};
    for (const auto &[value, name] : productTypes) {
        HostText text(ProductTypeName(value));
        EXPECT_STREQ(text.get(), name) << value;
    }
    const std::pair<int32_t, const char *> polarizations[] = {
        {kHH, "HH"}, {kVH, "VH"}, {kHV, "HV"}, {kVV, "VV"}, {4, "Unknown"}};
    for (const auto &[code, name] : polarizations)
        EXPECT_STREQ(PolarizationName(code), name) << code;
}

TEST(MetadataLists, file_metadata_extends_the_callers_list_in_order) {
    ZirOdi2SLCS4C model;
    model.SetProductType(static_cast<int32_t>(ProductType::SLC));
    AddBands(model, {kHH, kVH, kHV, kVV});
    model.SetCalibrationType("Sigma Nought");
    model.SetRangeLooks("4");
    model.SetAzimuthLooks("1");
    StringListKeeper product;
    product.Set("BeamMode", "FQ1");
    product.Set("RowCount", "30");
    model.SetMetadata(product.Get());

    StringListKeeper list(AddStringToList(nullptr, "Caller: kept"));
    list.Reset(model.FileMetadata(list.Release()));
    // clang-format off
    const std::vector<std::string> expected = {
        "Caller: kept", "SensorModelName: RADARSAT_2", "SensorType: SAR",
        "SensorCode: SAR", "ProductType: SLC", "Matrix_Type: s4c",
        "SAR_Calibration: Sigma0", "RadarBand: C", "Polarizations: HH, HV, VH, VV",
        "NumRangeLooks: 4", "NumAzimuthLooks: 1", "NumLooks: 4",
        "BeamMode: FQ1", "RowCount: 30",
        "DefaultRed: 1", "DefaultGreen: 2", "DefaultBlue: 4"};
    // clang-format on
    EXPECT_EQ(ListTexts(list.Get()), expected);
    // The model keeps its own list.
    EXPECT_EQ(ListTexts(model.GetMetadata()),
              (std::vector<std::string>{"BeamMode: FQ1", "RowCount: 30"}));
}

TEST(MetadataLists, default_display_channels_need_a_quad_or_co_and_cross_pair) {
    struct Case {
        const char *comment;
        Factory make;
        std::vector<int32_t> bands;
        std::vector<std::string> defaults; // red, green, blue; empty: none
    };
    // clang-format off
    const Case cases[] = {
        {"quad SLC", Of<ZirOdi2SLCS4C>(), {kHH, kVH, kHV, kVV}, {"1", "2", "4"}},
        {"quad geocoded, whatever its bands", Of<RUZ2GeocC4R>(), {}, {"1", "2", "4"}},
        {"dual HH and HV", Of<RUZ2GrpC2R>(), {kHH, kHV}, {"1", "2", "1"}},
        {"dual VV and VH", Of<ZirOdi2SLCS2C>(), {kVV, kVH}, {"1", "2", "1"}},
        {"dual HH and VV", Of<RUZ2GrpC2R>(), {kHH, kVV}, {}},
        {"dual with one image", Of<RUZ2GeocC2R>(), {kHV}, {}},
        {"single", Of<RUZ2GrpcCR>(), {kHH}, {}},
    };
    // clang-format on
    for (const Case &c : cases) {
        SCOPED_TRACE(c.comment);
        std::unique_ptr<ZirOdi2CalibImage> model = c.make();
        AddBands(*model, c.bands);
        std::vector<std::string> defaults;
        for (const char *key : {"DefaultRed", "DefaultGreen", "DefaultBlue"})
            if (std::optional<std::string> value = FileEntry(*model, key))
                defaults.push_back(*value);
        EXPECT_EQ(defaults, c.defaults);
    }
}

TEST(MetadataLists, calibration_entry_uses_the_short_names) {
    struct Case {
        const char *calibrationType;
        std::optional<std::string> expected;
    };
    const Case cases[] = {
        {"None", "None"},         {"Sigma Nought", "Sigma0"},
        {"beta nought", "Beta0"}, {"Gamma", "Gamma"},
        {"Sigma", std::nullopt},  {nullptr, std::nullopt},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.calibrationType ? c.calibrationType : "(unset)");
        RUZ2GrpcCR model;
        AddBands(model, {kHH});
        if (c.calibrationType != nullptr)
            model.SetCalibrationType(c.calibrationType);
        EXPECT_EQ(FileEntry(model, "SAR_Calibration"), c.expected);
    }
}

TEST(MetadataLists, look_count_needs_two_positive_numbers) {
    struct Case {
        const char *range;
        const char *azimuth;
        std::optional<std::string> looks;
    };
    const Case cases[] = {
        {"4", "1", "4"},
        {"2.5", "2", "5"},
        {"0", "1", std::nullopt},
        {"abc", "2", std::nullopt},
        {"-2", "-2", std::nullopt},
        {nullptr, nullptr, std::nullopt},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(std::string(c.range ? c.range : "(unset)") + " x " +
                     (c.azimuth ? c.azimuth : "(unset)"));
        ZirOdi2SLC model;
        AddBands(model, {kHH});
        if (c.range != nullptr)
            model.SetRangeLooks(c.range);
        if (c.azimuth != nullptr)
            model.SetAzimuthLooks(c.azimuth);
        EXPECT_EQ(FileEntry(model, "NumLooks"), c.looks);
        // The look counts themselves are always listed, empty when unknown.
        EXPECT_EQ(FileEntry(model, "NumRangeLooks"), c.range ? c.range : "");
    }
}

TEST(MetadataLists, channel_metadata_describes_a_defined_channel) {
    struct Case {
        const char *comment;
        Factory make;
        std::vector<int32_t> bands;
        int32_t channel;
        std::vector<std::string> entries; // after "Caller: kept"
    };
    // clang-format off
    const Case cases[] = {
        {"detected HV", Of<RUZ2GrpcCR>(), {kHV}, 1, {"Matrix_Element: _2_2", "Scale: linear", "Polarization: HV"}},
        // HH and VH: channel 1 is VV, which has no image.
        {"channel without an image", Of<RUZ2GrpC2R>(), {kHH, kVH}, 1, {"Matrix_Element: _4_4", "Scale: linear"}},
        {"channel without a record", Of<RUZ2GrpcCR>(), {kHV}, 2, {}},
    };
    // clang-format on
    for (const Case &c : cases) {
        SCOPED_TRACE(c.comment);
        std::unique_ptr<ZirOdi2CalibImage> model = c.make();
        AddBands(*model, c.bands);
        StringListKeeper list(AddStringToList(nullptr, "Caller: kept"));
        list.Reset(model->ChannelMetadata(c.channel, list.Release()));
        std::vector<std::string> expected = {"Caller: kept"};
        expected.insert(expected.end(), c.entries.begin(), c.entries.end());
        EXPECT_EQ(ListTexts(list.Get()), expected);
    }
}

TEST(MetadataLists, channel_descriptions) {
    struct Case {
        const char *comment;
        Factory make;
        std::vector<int32_t> bands;
        const char *calibrationType;
        int32_t channel;
        const char *expected;
    };
    // clang-format off
    const Case cases[] = {
        {"detected", Of<RUZ2GrpcCR>(), {kHV}, "None", 1, "HV detected data"},
        {"complex, calibrated", Of<ZirOdi2SLC>(), {kVV}, "Beta Nought", 1, "VV Beta Nought Complex"},
        {"complex, uncalibrated", Of<ZirOdi2SLC>(), {kVV}, "None", 1, "VV Uncalibrated Complex"},
        {"complex, none in another case", Of<ZirOdi2SLC>(), {kVV}, "NONE", 1, "VV Uncalibrated Complex"},
        {"complex, calibration unset", Of<ZirOdi2SLC>(), {kVV}, nullptr, 1, "VV Uncalibrated Complex"},
        {"channel without an image", Of<RUZ2GrpC2R>(), {kHH, kVH}, "None", 1, ""},
        {"its partner with one", Of<RUZ2GrpC2R>(), {kHH, kVH}, "None", 2, "VH detected data"},
        {"channel without a record", Of<RUZ2GrpcCR>(), {kHH}, "None", 5, ""},
    };
    // clang-format on
    for (const Case &c : cases) {
        SCOPED_TRACE(c.comment);
        std::unique_ptr<ZirOdi2CalibImage> model = c.make();
        AddBands(*model, c.bands);
        if (c.calibrationType != nullptr)
            model->SetCalibrationType(c.calibrationType);
        model->ChannelCount(); // open defines the channels first
        EXPECT_STREQ(model->ChannelDescription(c.channel), c.expected);
    }
}

TEST(MetadataLists, incidence_angle_entry_is_appended) {
    StringListKeeper list(AddStringToList(nullptr, "First: 1"));
    list.Reset(ZirOdi2CalibImage::IncidenceAngleMetadata(list.Release()));
    EXPECT_EQ(ListTexts(list.Get()),
              (std::vector<std::string>{"First: 1", "IncidenceAngle: vector"}));
}

} // namespace
