#include "host/ModelSegments.hpp"
#include "host/ProjectionServices.hpp"
#include "host/RasterServices.hpp"
#include "model/ProductVariants.hpp"
#include "tests/support/LoadedProduct.hpp"
#include "tests/support/TiffWriter.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

namespace {

using rs2test::LoadedProduct;

struct RecordDeleter {
    void operator()(RFInfo_t *record) const { RFDeallocate(record); }
};
using RecordKeeper = std::unique_ptr<RFInfo_t, RecordDeleter>;

struct ImageCloser {
    void operator()(FILE *image) const { VXBClose(image); }
};
using ImageKeeper = std::unique_ptr<FILE, ImageCloser>;

constexpr unsigned char kUntouched = 0xEE;

std::vector<unsigned char> Request(ZirOdi2CalibImage &model, int32_t offset,
                                   int32_t length, size_t room) {
    std::vector<unsigned char> buffer(room, kUntouched);
    model.RpcBinarySegment(offset, length, buffer.data());
    return buffer;
}

std::vector<unsigned char> WholeBlock(ZirOdi2CalibImage &model) {
    return Request(model, 0, kRFBlockSize, kRFBlockSize);
}

RecordKeeper Decode(const std::vector<unsigned char> &block) {
    return RecordKeeper(
        VXBBinaryToRFInfo(block.data(), static_cast<int32_t>(block.size())));
}

// Replaces the product's first image with a 16-bit GeoTIFF of the same
// size carrying the georeferencing of shape.
void ReplaceImage(const rs2gen::GeneratedProduct &product,
                  const rs2gen::ProductOptions &options,
                  rs2test::TiffShape shape) {
    shape.width = static_cast<uint32_t>(options.width);
    shape.height = static_cast<uint32_t>(options.height);
    rs2test::WriteTiff(product.imageFiles[0], shape,
                       [](uint32_t x, uint32_t y, uint32_t) {
                           return static_cast<double>(x + y);
                       });
}

// North-up in UTM zone 10 north (EPSG 32610), 10 m pixels.
rs2test::TiffShape UtmImage() {
    rs2test::TiffShape shape;
    shape.geoKeys = {1024, 1, 1025, 1, 3072, 32610};
    shape.pixelScale = {10.0, 10.0, 0.0};
    shape.tiePoints = {0.0, 0.0, 0.0, 480000.0, 5450000.0, 0.0};
    return shape;
}

// No georeferencing, but an RPC model of its own (every value non-zero).
rs2test::TiffShape ImageWithRpc() {
    rs2test::TiffShape shape;
    for (int i = 0; i < 92; ++i)
        shape.rpcCoefficients.push_back(i + 1.5);
    return shape;
}

ProjInfo_t ProjectionOf(const std::string &path) {
    ProjInfo_t projection;
    InitProjInfo(&projection, 0);
    ImageKeeper image(VXBOpen(path.c_str(), "r"));
    EXPECT_NE(image, nullptr) << path;
    if (image)
        VXBProjectionIO(image.get(), 0, &projection);
    return projection;
}

int32_t BinaryLengthOf(const std::string &path) {
    ImageKeeper image(VXBOpen(path.c_str(), "r"));
    EXPECT_NE(image, nullptr) << path;
    return image ? VXBGetBinaryLength(image.get(), 1) : -1;
}

} // namespace

TEST(RpcBinarySegment, ties_the_model_to_longitude_latitude_without_a_map) {
    // The image file holds no georeferencing.
    rs2gen::ProductOptions options;
    LoadedProduct loaded(options);
    ASSERT_NE(loaded.model, nullptr);
    ASSERT_EQ(DecodeGeosys(ProjectionOf(loaded.product.imageFiles[0]).geosys,
                           nullptr),
              kGeosysPixel);
    const RFInfo_t *source = loaded.reader.rationalFunctions;
    ASSERT_NE(source, nullptr);
    // A model without bands, and a product whose image file is missing.
    RUZ2GrpcCR bare;
    RecordKeeper record(RFAllocate(nullptr, kRFBlockCoefficients));
    ASSERT_NE(record, nullptr);
    bare.SetRationalFunctions(record.get());
    options.images = false;
    LoadedProduct missing(options);
    ASSERT_NE(missing.model, nullptr);

    for (ZirOdi2CalibImage *model :
         {loaded.model.get(), static_cast<ZirOdi2CalibImage *>(&bare),
          missing.model.get()}) {
        RecordKeeper served = Decode(WholeBlock(*model));
        ASSERT_NE(served, nullptr);
        EXPECT_STREQ(served->geosys, "LONG D0");
        EXPECT_EQ(model->RpcBinaryLength(), kRFBlockSize);
    }
    RecordKeeper served = Decode(WholeBlock(*loaded.model));
    EXPECT_STREQ(served->sensorName, "RADARSAT-2");
    EXPECT_EQ(served->width, options.width);
    EXPECT_EQ(served->height, options.height);
    EXPECT_EQ(served->lineOffset, source->lineOffset);
    EXPECT_EQ(served->longitudeScale, source->longitudeScale);
    for (int i = 0; i < kRFBlockCoefficients; ++i) {
        EXPECT_EQ(served->lineNumeratorCoefficients[i],
                  source->lineNumeratorCoefficients[i]);
        EXPECT_EQ(served->pixelDenominatorCoefficients[i],
                  source->pixelDenominatorCoefficients[i]);
    }
}

TEST(RpcBinarySegment,
     takes_the_coordinate_system_and_parameters_of_a_utm_image) {
    rs2gen::ProductOptions options;
    LoadedProduct loaded(options, "", [&](const rs2gen::GeneratedProduct &p) {
        ReplaceImage(p, options, UtmImage());
    });
    ASSERT_NE(loaded.model, nullptr);
    const ProjInfo_t image = ProjectionOf(loaded.product.imageFiles[0]);
    ASSERT_EQ(DecodeGeosys(image.geosys, nullptr), kGeosysUTM);

    RecordKeeper served = Decode(WholeBlock(*loaded.model));
    ASSERT_NE(served, nullptr);
    EXPECT_STREQ(served->geosys, image.geosys);
    EXPECT_STREQ(served->projection->geosys, image.geosys);
    const double unit[6] = {0.0, 1.0, 0.0, 0.0, 0.0, 1.0};
    for (int i = 0; i < 6; ++i)
        EXPECT_EQ(served->projection->transform[i], unit[i]) << i;
    for (int i = 0; i < kProjParmCount; ++i)
        EXPECT_EQ(served->projection->parms[i], image.parms[i]) << i;
    EXPECT_EQ(served->projection->parms[0], 10.0);
}

TEST(RpcBinarySegment, copies_no_more_than_the_requested_length) {
    LoadedProduct loaded(rs2gen::ProductOptions{});
    ASSERT_NE(loaded.model, nullptr);
    const std::vector<unsigned char> block = WholeBlock(*loaded.model);
    // The same request gives the same bytes.
    EXPECT_EQ(WholeBlock(*loaded.model), block);
    struct Case {
        int32_t offset, length, copied;
    } cases[] = {{0, 100, 100},
                 {0, kRFBlockSize, kRFBlockSize},
                 {0, 4000, kRFBlockSize},
                 {0, 0, 0},
                 {0, -5, 0},
                 {200, 300, 300}};
    for (const Case &c : cases) {
        const std::vector<unsigned char> buffer =
            Request(*loaded.model, c.offset, c.length, 4096);
        const auto copiedEnd = buffer.begin() + c.copied;
        // The whole model is the segment: it starts at the buffer's start.
        EXPECT_TRUE(std::equal(buffer.begin(), copiedEnd, block.begin()))
            << c.length;
        EXPECT_TRUE(std::all_of(copiedEnd, buffer.end(), [](unsigned char b) {
            return b == kUntouched;
        })) << c.length;
    }
}

TEST(RpcBinarySegment, passes_the_request_to_the_image_without_a_model) {
    rs2gen::ProductOptions options;
    options.rationalFunctions = false;
    LoadedProduct loaded(options, "", [&](const rs2gen::GeneratedProduct &p) {
        ReplaceImage(p, options, ImageWithRpc());
    });
    ASSERT_NE(loaded.model, nullptr);
    ASSERT_EQ(loaded.reader.rationalFunctions, nullptr);

    ImageKeeper image(VXBOpen(loaded.product.imageFiles[0].c_str(), "r"));
    ASSERT_NE(image, nullptr);
    std::vector<unsigned char> direct(50, kUntouched);
    VXBBinaryIO(image.get(), 0, 1, 100, 50, direct.data());

    const std::vector<unsigned char> served =
        Request(*loaded.model, 100, 50, 50);
    EXPECT_EQ(served, direct);
    EXPECT_EQ(loaded.model->RpcBinaryLength(), kRFBlockSize);
}

TEST(RpcBinarySegment, leaves_the_buffer_alone_without_model_or_image) {
    RUZ2GrpcCR model;
    const std::vector<unsigned char> buffer = Request(model, 0, 64, 64);
    EXPECT_EQ(buffer, std::vector<unsigned char>(64, kUntouched));
    EXPECT_EQ(model.RpcBinaryLength(), kRFBlockSize);
}

TEST(RpcBinaryLength, is_the_length_of_what_a_read_serves) {
    enum class Image { Plain, WithRpc };
    struct Case {
        const char *what;
        bool model;
        Image image;
        int32_t length; // -1: the image file's own segment length
    } cases[] = {
        {"the model's block, the image having none", true, Image::Plain,
         kRFBlockSize},
        {"the model's block, not the image's", true, Image::WithRpc,
         kRFBlockSize},
        {"the image file's empty segment", false, Image::Plain, 0},
        {"the image file's segment", false, Image::WithRpc, -1},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        rs2gen::ProductOptions options;
        options.rationalFunctions = c.model;
        LoadedProduct loaded(options, "",
                             [&](const rs2gen::GeneratedProduct &p) {
                                 if (c.image == Image::WithRpc)
                                     ReplaceImage(p, options, ImageWithRpc());
                             });
        ASSERT_NE(loaded.model, nullptr);
        ASSERT_EQ(loaded.reader.rationalFunctions != nullptr, c.model);
        const int32_t imageLength =
            BinaryLengthOf(loaded.product.imageFiles[0]);
        ASSERT_EQ(imageLength > 0, c.image == Image::WithRpc);
        const int32_t expected = c.length >= 0 ? c.length : imageLength;
        EXPECT_EQ(loaded.model->RpcBinaryLength(), expected);
        // A whole read of the reported length gives the segment: with a
        // model its block decodes.
        if (c.model) {
            EXPECT_NE(Decode(Request(*loaded.model, 0, expected,
                                     static_cast<size_t>(expected))),
                      nullptr);
        }
    }
}
