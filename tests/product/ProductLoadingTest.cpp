#include "product/ProductLoading.hpp"

#include "host/Exception.hpp"
#include "host/RasterServices.hpp"
#include "host/XmlUtil.hpp"
#include "model/ProductVariants.hpp"
#include "product/Bands.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"
#include "tools/generator/ProductGenerator.hpp"
#include "tools/generator/SceneGeometry.hpp"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cxxabi.h>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <typeinfo>
#include <vector>

namespace {

using ModelPtr = std::unique_ptr<ZirOdi2CalibImage>;

const char *const kRealProduct =
    RS2_SOURCE_DIR "/../shared/realdata/rs2_slc_f0w2_hh_20170430/product.xml";

std::string WriteFile(const rs2test::TempDir &dir, const std::string &name,
                      const std::string &text) {
    return rs2test::WriteFile(dir.File(name), text);
}

// The class name of a model, or "none".
std::string ClassOf(const ZirOdi2CalibImage *model) {
    if (model == nullptr)
        return "none";
    int status = -1;
    const std::unique_ptr<char, decltype(&std::free)> name(
        abi::__cxa_demangle(typeid(*model).name(), nullptr, nullptr, &status),
        &std::free);
    return status == 0 ? name.get() : "unnamed class";
}

// A generated product small enough to write quickly; the image files are
// left out, the elements naming them stay.
rs2gen::ProductOptions Options(const std::string &type,
                               std::vector<std::string> polarizations,
                               const std::string &acquisition = "") {
    rs2gen::ProductOptions options;
    options.productType = type;
    options.polarizations = std::move(polarizations);
    options.acquisitionType = acquisition;
    options.width = 16;
    options.height = 12;
    options.images = false;
    options.tieGridColumns = 4;
    options.tieGridRows = 4;
    return options;
}

TEST(LoadProduct, chooses_the_class_from_the_first_row_that_applies) {
    const std::vector<std::string> quad = {"HH", "HV", "VH", "VV"};
    struct Case {
        rs2gen::ProductOptions options;
        const char *expected; // class name, "none" or "exception"
    } cases[] = {
        {Options("SLC", {"HH"}, "Fine"), "ZirOdi2SLC"},
        {Options("SLC", {"VV"}, "Ultrafine"), "ZirOdi2SLC"},
        {Options("SGX", {"HV"}), "RUZ2GrpcCR"},
        {Options("SCW", {"HH"}, "Multi-Look Fine"), "RUZ2GrpcCR"},
        {Options("SSG", {"HH"}, "ScanSAR Narrow"), "RUZ2GeocCR"},
        {Options("SPG", {"VV"}), "RUZ2GeocCR"},
        {Options("GCD", {"HH"}), "exception"},
        {Options("GCD", {"HH", "HV"}), "exception"},
        {Options("SLC", quad, "Standard Quad Polarization"), "ZirOdi2SLCS4C"},
        {Options("SLC", {"HH", "HV"}, "Standard"), "ZirOdi2SLCS2C"},
        {Options("SLC", {"VV", "VH"}, "Wide"), "ZirOdi2SLCS2C"},
        {Options("SLC", {"HH", "HV"}, "Ultrafine"), "none"},
        {Options("SLC", quad, "ScanSAR Wide"), "none"},
        {Options("SGF", quad, "Fine Quad Polarization"), "RUZ2GrpC4R"},
        {Options("SCW", {"HH", "HV"}, "ScanSAR Wide"), "RUZ2GrpC2R"},
        {Options("SCN", {"VV", "VH"}, "ScanSAR Narrow"), "RUZ2GrpC2R"},
        {Options("SGC", {"HH", "HV"}, "Standard"), "RUZ2GrpC2R"},
        {Options("SGF", {"HH", "HV"}, "Low Incidence"), "none"},
        {Options("SPG", quad, "Standard Quad Polarization"), "RUZ2GeocC4R"},
        {Options("SSG", {"HH", "HV"}, "Wide"), "RUZ2GeocC2R"},
        {Options("SSG", {"HH", "HV"}, "ScanSAR Wide"), "none"},
        {Options("SPG", {"HH", "HV"}, "High Incidence"), "none"},
        // Type names are whole texts, case ignored.
        {Options("sgf", {"HH"}), "RUZ2GrpcCR"},
        {Options("SGF ", {"HH"}), "exception"},
        {Options("SGF", {"HH", "HV"}, "Fine "), "none"},
    };
    const int start = ORV_XMLUtil::InitializeCount();
    for (const Case &c : cases) {
        SCOPED_TRACE("\"" + c.options.productType + "\" " +
                     std::to_string(c.options.polarizations.size()) +
                     " image(s) \"" + c.options.acquisitionType + "\"");
        rs2test::TempDir dir;
        auto product = rs2gen::GenerateProduct(dir.Path(), c.options);
        ProductReader reader;
        std::string outcome;
        try {
            ModelPtr model(
                LoadProduct(reader, product.productXml.c_str(), "sigma"));
            outcome = ClassOf(model.get());
        } catch (const orv::Exception &error) {
            EXPECT_STREQ(error.what(), "Unknown product type");
            EXPECT_EQ(error.Number(), 0);
            outcome = "exception";
        }
        EXPECT_EQ(outcome, c.expected);
        EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start);
    }
}

TEST(LoadProduct, treats_a_description_without_image_elements_as_multi_image) {
    struct Case {
        const char *acquisition;
        const char *expected;
    } cases[] = {{"Fine", "RUZ2GrpC2R"}, {"Ultrafine", "none"}};
    for (const Case &c : cases) {
        rs2test::TempDir dir;
        // Lists two polarizations but no fullResolutionImageData element.
        std::string path = WriteFile(
            dir, "product.xml",
            std::string("<product><productType>SGF</productType>"
                        "<acquisitionType>") +
                c.acquisition +
                "</acquisitionType><polarizations>HH HV</polarizations>"
                "</product>");
        ProductReader reader;
        ModelPtr model(LoadProduct(reader, path.c_str(), ""));
        EXPECT_EQ(ClassOf(model.get()), c.expected) << c.acquisition;
        if (model) {
            EXPECT_EQ(model->ChannelCount(), 2);
            EXPECT_STREQ(model->FindBand(0)->fileName, "");
        }
    }
}

TEST(LoadProduct, fills_the_model_from_the_description) {
    rs2test::TempDir dir;
    auto options = Options("SGF", {"HV", "HH"}, "Fine");
    options.images = true;
    auto product = rs2gen::GenerateProduct(dir.Path(), options);
    ProductReader reader;
    ModelPtr model(LoadProduct(reader, product.productXml.c_str(), "sigma"));
    ASSERT_EQ(ClassOf(model.get()), "RUZ2GrpC2R");
    EXPECT_STREQ(reader.productPath, product.productXml.c_str());
    EXPECT_EQ(model->GetProductType(), static_cast<int32_t>(ProductType::SGF));
    EXPECT_EQ(model->GetAcquisitionType(),
              static_cast<int32_t>(AcquisitionType::Fine));
    EXPECT_EQ(std::string(model->GetProductDirectory()), dir.Path() + "/");
    ASSERT_NE(model->FindBand(0), nullptr);
    ASSERT_NE(model->FindBand(2), nullptr);
    EXPECT_STREQ(model->FindBand(0)->fileName,
                 rs2gen::ImageFileName("HH").c_str());
    EXPECT_STREQ(model->FindBand(2)->fileName,
                 rs2gen::ImageFileName("HV").c_str());
    const rs2gen::ProductLayout layout =
        rs2gen::SceneGeometry(options).Layout();
    ASSERT_NE(model->GetRangeLooks(), nullptr);
    ASSERT_NE(model->GetAzimuthLooks(), nullptr);
    EXPECT_EQ(model->GetRangeLooks(), std::to_string(layout.rangeLooks));
    EXPECT_EQ(model->GetAzimuthLooks(), std::to_string(layout.azimuthLooks));
    EXPECT_EQ(model->ChannelCount(), 2);
    EXPECT_EQ(model->Width(), options.width);
    EXPECT_EQ(model->Height(), options.height);
}

TEST(LoadProduct, applies_calibration_only_where_asked_and_permitted) {
    struct Case {
        const char *type;
        const char *option;
        bool calibrated;
    } cases[] = {
        {"SGF", "sigma", true},  {"SGF", "gamma", true},
        {"SLC", "beta", true},   {"SGF", "none", false},
        {"SGF", "NONE", false},  {"SGF", "", false},
        {"SGF", nullptr, false}, {"SSG", "sigma", false},
        {"SPG", "beta", false},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(std::string(c.type) + " " +
                     (c.option ? c.option : "null"));
        rs2test::TempDir dir;
        auto options = Options(c.type, {"HH"});
        auto product = rs2gen::GenerateProduct(dir.Path(), options);
        ProductReader reader;
        ModelPtr model(
            LoadProduct(reader, product.productXml.c_str(), c.option));
        ASSERT_NE(model, nullptr);
        ASSERT_NE(model->GetCalibrationType(), nullptr);
        EXPECT_EQ(std::string(model->GetCalibrationType()) != "None",
                  c.calibrated);
        EXPECT_EQ(model->CalibrationTable().Size() > 0, c.calibrated);
        // Incidence angles are read for every class.
        EXPECT_EQ(model->IncidenceTable().Size(),
                  static_cast<size_t>(options.width));
    }
}

TEST(LoadProduct, gives_no_model_for_what_cannot_be_parsed) {
    rs2test::TempDir dir;
    const int start = ORV_XMLUtil::InitializeCount();
    ProductReader reader;
    EXPECT_EQ(LoadProduct(reader, nullptr, ""), nullptr);
    EXPECT_EQ(reader.productPath, nullptr);
    EXPECT_EQ(LoadProduct(reader, dir.File("missing.xml").c_str(), ""),
              nullptr);
    EXPECT_STREQ(reader.productPath, dir.File("missing.xml").c_str());
    EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start);
}

TEST(LoadProduct, refuses_a_successor_mission_product) {
    rs2test::TempDir dir;
    // Another mission's description: its own namespace and product types.
    std::string path = WriteFile(dir, "product.xml",
                                 R"(<?xml version="1.0" encoding="UTF-8"?>
<product xmlns="urn:successor-mission:product">
  <productId>SM1_0000001_GCD</productId>
  <sceneAttributes><imageAttributes>
    <productType>GCD</productType>
    <acquisitionType>Medium Resolution 16m</acquisitionType>
    <polarizations>HH</polarizations>
  </imageAttributes></sceneAttributes>
  <fullResolutionImageData pole="HH">imagery/hh.tif</fullResolutionImageData>
</product>
)");
    const int start = ORV_XMLUtil::InitializeCount();
    ProductReader reader;
    try {
        ModelPtr model(LoadProduct(reader, path.c_str(), ""));
        ADD_FAILURE() << "loaded as " << ClassOf(model.get());
    } catch (const orv::Exception &error) {
        EXPECT_STREQ(error.what(), "Unknown product type");
        // The parse is released before the exception leaves the loader.
        EXPECT_EQ(ORV_XMLUtil::InitializeCount(), start);
    }
}

TEST(LoadProduct, loads_the_real_single_look_complex_product) {
    struct stat info;
    if (stat(kRealProduct, &info) != 0)
        GTEST_SKIP() << kRealProduct << " is not available";
    ProductReader reader;
    ModelPtr model(LoadProduct(reader, kRealProduct, ""));
    // Its size and calibration choices are checked in RealProductTest.
    ASSERT_EQ(ClassOf(model.get()), "ZirOdi2SLC");
    EXPECT_EQ(model->GetAcquisitionType(),
              static_cast<int32_t>(AcquisitionType::Fine));
    ASSERT_NE(model->FindBand(0), nullptr);
    for (int32_t code = 1; code < 4; ++code)
        EXPECT_EQ(model->FindBand(code), nullptr) << code;
    EXPECT_STREQ(model->FindBand(0)->fileName, "imagery_HH.tif");
    EXPECT_EQ(model->ChannelCount(), 1);
    EXPECT_STREQ(model->FindChannel(1)->description, "Matrix_Element: _1_1");
    EXPECT_STREQ(model->GetRangeLooks(), "1");
    EXPECT_STREQ(model->GetAzimuthLooks(), "1");
}

// Parses XML text and registers its bands in a quad-polarization model.
struct ParsedBands {
    explicit ParsedBands(const std::string &text)
        : parse(WriteFile(dir, "product.xml", text).c_str()) {
        ReadPolarizations(parse.Document(), &model);
    }
    rs2test::TempDir dir;
    DocumentParse parse;
    RUZ2GrpC4R model;
};

std::string
Images(const std::vector<std::pair<const char *, const char *>> &poleAndFile) {
    std::string text;
    for (const auto &entry : poleAndFile)
        text += std::string("<fullResolutionImageData pole=\"") + entry.first +
                "\">" + entry.second + "</fullResolutionImageData>";
    return text;
}

TEST(ReadPolarizations, registers_one_band_per_recognised_name) {
    struct Case {
        const char *polarizations; // null: no polarizations element
        std::string images;
        // The file name of each code 0..3; null: no band.
        std::vector<const char *> files;
    };
    // clang-format off
    const Case cases[] = {
        {"HH HV", Images({{"HH", "a.tif"}, {"HV", "b.tif"}}), {"a.tif", nullptr, "b.tif", nullptr}},
        {"HH VV HV VH", Images({{"VH", "vh"}, {"HV", "hv"}, {"VV", "vv"}, {"HH", "hh"}}), {"hh", "vh", "hv", "vv"}},
        // An empty token between two spaces is skipped.
        {"HH  HV", Images({{"HH", "a"}, {"HV", "b"}}), {"a", nullptr, "b", nullptr}},
        // Only single spaces separate: "HV\n" is no polarization name.
        {"HH HV\n", Images({{"HH", "a"}, {"HV", "b"}}), {"a", nullptr, nullptr, nullptr}},
        {"HH\tHV", Images({{"HH", "a"}, {"HV", "b"}}), {nullptr, nullptr, nullptr, nullptr}},
        {"hh vv", Images({{"Hh", "a"}, {"VV", "b"}}), {"a", nullptr, nullptr, "b"}},
        {"HH HH", Images({{"HH", "a"}}), {"a", nullptr, nullptr, nullptr}},
        // A listed name without an image element still gets a band.
        {"HH VV", Images({{"HH", "a"}}), {"a", nullptr, nullptr, ""}},
        {"XX HH", Images({{"XX", "x"}, {"HH", "a"}}), {"a", nullptr, nullptr, nullptr}},
        {nullptr, Images({{"HH", "a"}}), {nullptr, nullptr, nullptr, nullptr}},
    };
    // clang-format on
    for (const Case &c : cases) {
        std::string list = c.polarizations != nullptr
                               ? std::string("<polarizations>") +
                                     c.polarizations + "</polarizations>"
                               : std::string();
        SCOPED_TRACE(list);
        ParsedBands parsed("<product>" + list + c.images + "</product>");
        for (int32_t code = 0; code < 4; ++code) {
            const BandRecord *band = parsed.model.FindBand(code);
            if (c.files[code] == nullptr) {
                EXPECT_EQ(band, nullptr) << "code " << code;
                continue;
            }
            ASSERT_NE(band, nullptr) << "code " << code;
            EXPECT_STREQ(band->fileName, c.files[code]);
            EXPECT_EQ(band->imageHandle, nullptr);
        }
    }
}

TEST(TypeNames, map_whole_names_ignoring_case) {
    struct Case {
        const char *name;
        AcquisitionType acquisition;
        Polarization polarization;
    } cases[] = {
        {"Standard", AcquisitionType::Standard, Polarization::Unknown},
        {"scansar wide", AcquisitionType::ScanSARWide, Polarization::Unknown},
        {"FINE QUAD POLARIZATION", AcquisitionType::FineQuadPolarization,
         Polarization::Unknown},
        {"Multi-Look Fine", AcquisitionType::MultiLookFine,
         Polarization::Unknown},
        // Whole texts only: no trimming, no prefixes.
        {" Fine", AcquisitionType::Unknown, Polarization::Unknown},
        {"Fine Quad", AcquisitionType::Unknown, Polarization::Unknown},
        {"", AcquisitionType::Unknown, Polarization::Unknown},
        {nullptr, AcquisitionType::Unknown, Polarization::Unknown},
        {"hh", AcquisitionType::Unknown, Polarization::HH},
        {"VH", AcquisitionType::Unknown, Polarization::VH},
        {"hV", AcquisitionType::Unknown, Polarization::HV},
        {"HHV", AcquisitionType::Unknown, Polarization::Unknown},
    };
    for (const Case &c : cases) {
        const char *shown = c.name != nullptr ? c.name : "null";
        EXPECT_EQ(AcquisitionTypeFromName(c.name), c.acquisition) << shown;
        EXPECT_EQ(PolarizationFromName(c.name), c.polarization) << shown;
    }
    EXPECT_EQ(ParseProductType(nullptr), ProductType::Unknown);
    EXPECT_EQ(ParseAcquisitionType(nullptr), AcquisitionType::Unknown);
}

} // namespace
