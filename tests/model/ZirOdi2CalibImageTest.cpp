#include "model/ZirOdi2CalibImage.hpp"

#include "host/ErrorReports.hpp"
#include "host/HostMemory.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"
#include "model/ProductVariants.hpp"
#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <string>
#include <vector>

namespace {

constexpr int32_t kHH = static_cast<int32_t>(Polarization::HH);
constexpr int32_t kHV = static_cast<int32_t>(Polarization::HV);
constexpr int32_t kVV = static_cast<int32_t>(Polarization::VV);

using host::HostList;

// Counts how often the channel table is built.
class CountingProduct : public RUZ2GrpC2R {
  public:
    void DefineChannels() override {
        ++defineCount;
        RUZ2GrpC2R::DefineChannels();
    }
    int defineCount = 0;
};

TEST(LookupTable, reads_past_its_end_as_the_neutral_gain) {
    LookupTable table(8);
    EXPECT_EQ(table.Size(), 0u);
    EXPECT_FLOAT_EQ(table.Get(0), 1.0f);
    table.Resize(3);
    table.Set(1, 2.5f);
    // An index beyond the table is dropped, not written.
    table.Set(3, 9.0f);
    EXPECT_EQ(table.Size(), 3u);
    EXPECT_FLOAT_EQ(table.Get(0), 0.0f);
    EXPECT_FLOAT_EQ(table.Get(1), 2.5f);
    EXPECT_FLOAT_EQ(table.Get(3), 1.0f);
    table.SetOffset(-4.0f);
    EXPECT_FLOAT_EQ(table.Offset(), -4.0f);
    table.Resize(2);
    EXPECT_FLOAT_EQ(table.Get(1), 0.0f);
}

TEST(ZirOdi2CalibImage, replaces_a_band_and_a_channel_of_the_same_key) {
    RUZ2GrpC4R model;
    model.AddBand(kHV, "first.tif");
    model.AddBand(kHV, "second.tif");
    ASSERT_NE(model.FindBand(kHV), nullptr);
    EXPECT_STREQ(model.FindBand(kHV)->fileName, "second.tif");
    EXPECT_EQ(model.FindBand(kHV)->polarization, kHV);
    EXPECT_EQ(model.FindBand(kHH), nullptr);

    model.SetChannel(1, model.NewChannel(kHV, "one", 1, 0));
    model.SetChannel(1, model.NewChannel(kVV, "two", 1, 2));
    ASSERT_NE(model.FindChannel(1), nullptr);
    EXPECT_STREQ(model.FindChannel(1)->description, "two");
    EXPECT_EQ(model.FindChannel(1)->band, nullptr);
    EXPECT_EQ(model.FindChannel(1)->kind, 2);
    EXPECT_EQ(model.FindChannel(2), nullptr);
}

TEST(ZirOdi2CalibImage, defines_its_channels_once) {
    CountingProduct model;
    model.AddBand(kHH, "");
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(model.ChannelCount(), 2);
        EXPECT_EQ(model.Width(), 0);
        EXPECT_EQ(model.Height(), 0);
    }
    EXPECT_EQ(model.defineCount, 1);
}

TEST(ZirOdi2CalibImage, copies_texts_lists_and_tie_points) {
    RUZ2GrpcCR model;
    model.SetCalibrationType("Sigma Nought");
    // Setting a text from itself must survive the release of the old copy.
    model.SetCalibrationType(model.GetCalibrationType());
    EXPECT_STREQ(model.GetCalibrationType(), "Sigma Nought");

    HostList list(AddStringToList(nullptr, "BeamMode: F0W2"));
    model.SetMetadata(list.get());
    list.reset();
    model.SetMetadata(model.GetMetadata());
    EXPECT_STREQ(FetchAuxEntry(model.GetMetadata(), "BeamMode"), "F0W2");

    const double lines[] = {0.5, 10.5, 20.5};
    EXPECT_FALSE(model.SetTieLines(lines));
    model.SetTiePointCount(3);
    EXPECT_FALSE(model.SetTiePixels(nullptr));
    EXPECT_TRUE(model.SetTieLines(lines));
    EXPECT_TRUE(model.SetTieLines(lines));
}

TEST(ZirOdi2CalibImage, takes_the_directory_of_the_description) {
    struct Case {
        const char *path;
        const char *directory; // null when none is stored
    } cases[] = {
        {"/data/rs2/product.xml", "/data/rs2/"},
        {"relative/dir/product.xml", "relative/dir/"},
        {"product.xml", ""},
        {nullptr, nullptr},
    };
    for (const Case &c : cases) {
        RUZ2GrpcCR model;
        model.SetProductDirectory("/old/product.xml");
        model.SetProductDirectory(c.path);
        if (c.directory == nullptr)
            EXPECT_EQ(model.GetProductDirectory(), nullptr);
        else
            EXPECT_STREQ(model.GetProductDirectory(), c.directory) << c.path;
    }
}

// A generated dual-polarization product with its GeoTIFFs.
class ImageFiles : public ::testing::Test {
  protected:
    void SetUp() override {
        options.productType = "SGF";
        options.polarizations = {"HH", "HV"};
        options.width = 40;
        options.height = 24;
        product = rs2gen::GenerateProduct(dir.Path(), options);
        host::ClearWarnings();
    }
    rs2test::TempDir dir;
    rs2gen::ProductOptions options;
    rs2gen::GeneratedProduct product;
};

TEST_F(ImageFiles, opens_each_file_once_and_closes_it_with_the_model) {
    auto model = std::make_unique<RUZ2GrpC2R>();
    model->SetProductDirectory(product.productXml.c_str());
    model->AddBand(kHH, rs2gen::ImageFileName("HH").c_str());
    model->AddBand(kHV, rs2gen::ImageFileName("HV").c_str());
    BandRecord *hh = model->FindBand(kHH);
    BandRecord *hv = model->FindBand(kHV);
    ASSERT_NE(hh, nullptr);
    ASSERT_NE(hv, nullptr);
    // Nothing opens before it is needed.
    EXPECT_EQ(hh->imageHandle, nullptr);
    EXPECT_EQ(model->Width(), options.width);
    EXPECT_EQ(model->Height(), options.height);
    FILE *first = hh->imageHandle;
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(hv->imageHandle, nullptr);
    EXPECT_EQ(model->OpenBand(*hh), first);
    EXPECT_EQ(model->Width(), options.width);
    EXPECT_EQ(hh->imageHandle, first);
    FILE *second = model->OpenBand(*hv);
    ASSERT_NE(second, nullptr);
    EXPECT_NE(second, first);
    EXPECT_STREQ(fp2filename(first), product.imageFiles[0].c_str());
    EXPECT_STREQ(fp2filename(second), product.imageFiles[1].c_str());
    model.reset();
    EXPECT_EQ(fp2filename(first), nullptr);
    EXPECT_EQ(fp2filename(second), nullptr);
    EXPECT_TRUE(host::Warnings().empty());
}

TEST_F(ImageFiles, treats_an_unopenable_file_as_a_band_without_image) {
    RUZ2GrpcCR model;
    model.SetProductDirectory(product.productXml.c_str());
    model.AddBand(kHH, "missing_HH.tif");
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(model.Width(), 0);
        EXPECT_EQ(model.Height(), 0);
        EXPECT_EQ(model.OpenBand(*model.FindBand(kHH)), nullptr);
    }
    // The host warns once, naming the file; the failure is remembered.
    std::vector<std::string> warnings = host::Warnings();
    ASSERT_EQ(warnings.size(), 1u);
    EXPECT_NE(warnings[0].find("missing_HH.tif"), std::string::npos);
    // A new name gets a new try.
    model.AddBand(kHH, rs2gen::ImageFileName("HH").c_str());
    EXPECT_EQ(model.Width(), options.width);
}

TEST_F(ImageFiles, keeps_names_relative_without_a_product_directory) {
    RUZ2GrpcCR model;
    // No directory stored: the file name alone is the path.
    model.AddBand(kHH, product.imageFiles[0].c_str());
    EXPECT_EQ(model.GetProductDirectory(), nullptr);
    EXPECT_EQ(model.Width(), options.width);
}

TEST_F(ImageFiles, opens_nothing_for_a_band_without_a_file_name) {
    RUZ2GrpcCR model;
    model.SetProductDirectory(product.productXml.c_str());
    model.AddBand(kHH, nullptr);
    EXPECT_STREQ(model.FindBand(kHH)->fileName, "");
    EXPECT_EQ(model.Width(), 0);
    EXPECT_EQ(model.FindBand(kHH)->imageHandle, nullptr);
    EXPECT_TRUE(host::Warnings().empty());
}

TEST_F(ImageFiles, refuses_an_image_file_that_leads_back_to_its_product) {
    // The image file named is the product description itself, which the
    // host hands to the driver: without a guard, opening the image would
    // open the product, whose image opens the product again, without end.
    if (std::getenv("VXB_DRIVER_PATH") == nullptr)
        setenv("VXB_DRIVER_PATH", RS2_DRIVER_MODULE, 1);
    std::string text = rs2test::FileText(product.productXml);
    const std::string image = ">" + rs2gen::ImageFileName("HH") + "<";
    ASSERT_NE(text.find(image), std::string::npos);
    text.replace(text.find(image), image.size(), ">product.xml<");
    rs2test::WriteFile(product.productXml, text);
    RUZ2GrpcCR model;
    model.SetProductDirectory(product.productXml.c_str());
    model.AddBand(kHH, "product.xml");
    EXPECT_EQ(model.Width(), 0);
    const std::vector<std::string> warnings = host::Warnings();
    EXPECT_TRUE(std::any_of(warnings.begin(), warnings.end(), [](auto &w) {
        return w.find("leads back to a product being opened") != w.npos;
    }));
}

} // namespace
