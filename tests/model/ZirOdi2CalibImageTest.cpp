#include "model/ZirOdi2CalibImage.hpp"

#include "host/ErrorReports.hpp"
#include "host/HostMemory.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"
#include "model/ProductVariants.hpp"
#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"
#include "tests/support/TiffWriter.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <sys/stat.h>
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

TEST_F(ImageFiles, opens_nothing_for_a_band_without_a_file_name) {
    RUZ2GrpcCR model;
    model.SetProductDirectory(product.productXml.c_str());
    model.AddBand(kHH, nullptr);
    EXPECT_STREQ(model.FindBand(kHH)->fileName, "");
    EXPECT_EQ(model.Width(), 0);
    EXPECT_EQ(model.FindBand(kHH)->imageHandle, nullptr);
    EXPECT_TRUE(host::Warnings().empty());
}

TEST_F(ImageFiles, serves_only_image_files_of_the_product_it_can_hold) {
    namespace fs = std::filesystem;
    const fs::path folder = fs::path(product.productXml).parent_path();
    const std::string image = rs2gen::ImageFileName("HH");
    rs2test::TempDir elsewhere;
    fs::copy_file(folder / image, elsewhere.File("other.tif"));
    fs::create_symlink(elsewhere.File("other.tif"), folder / "out.tif");
    fs::create_symlink(folder / image, folder / "in.tif");
    fs::create_directory(folder / "folder.tif");
    ASSERT_EQ(::mkfifo((folder / "pipe.tif").c_str(), 0600), 0);
    // 4 x 3 images of one sample layout, every element at value.
    const auto writeImage = [&](const char *name, uint16_t bits,
                                uint16_t format, double value) {
        rs2test::TiffShape shape;
        shape.width = 4;
        shape.height = 3;
        shape.bitsPerSample = bits;
        shape.sampleFormat = format;
        rs2test::WriteTiff(
            (folder / name).string(), shape,
            [value](uint32_t, uint32_t, uint32_t) { return value; });
    };
    writeImage("cint32.tif", 64, SAMPLEFORMAT_COMPLEXINT, 70000.0);
    writeImage("float.tif", 32, SAMPLEFORMAT_IEEEFP, 0.5);
    struct Case {
        std::string name;
        ProductType type;
        const char *warning; // null when the image opens
    } cases[] = {
        {"in.tif", ProductType::SGF, nullptr},
        {"product.xml", ProductType::SGF, "not a TIFF image"},
        {"out.tif", ProductType::SGF, "leads out of the product folder"},
        {"folder.tif", ProductType::SGF, "not a regular file"},
        {"pipe.tif", ProductType::SGF, "not a regular file"},
        {"%2e%2e/" + image + "?c=sigma", ProductType::SGF, "no such file"},
        {"cint32.tif", ProductType::SLC, "pairs of 16-bit integers"},
        {"cint32.tif", ProductType::SGF, "must be integers"},
        {"float.tif", ProductType::SGF, "must be integers"},
        {image, ProductType::SLC, "pairs of 16-bit integers"},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.name);
        host::ClearWarnings();
        RUZ2GrpcCR model;
        model.SetProductType(static_cast<int32_t>(c.type));
        model.SetProductDirectory(product.productXml.c_str());
        model.AddBand(kHH, c.name.c_str());
        EXPECT_EQ(model.Width(), c.warning ? 0 : options.width);
        const std::vector<std::string> warnings = host::Warnings();
        if (c.warning == nullptr) {
            EXPECT_TRUE(warnings.empty());
            continue;
        }
        ASSERT_EQ(warnings.size(), 1u);
        EXPECT_NE(warnings[0].find(c.warning), std::string::npos)
            << warnings[0];
    }
}

} // namespace
