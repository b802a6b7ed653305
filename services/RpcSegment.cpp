#include "host/HostMemory.hpp"
#include "host/ModelSegments.hpp"
#include "host/ProjectionServices.hpp"
#include "host/RasterServices.hpp"
#include "model/ZirOdi2CalibImage.hpp"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <memory>

namespace {

using host::FreeDeleter;

// An RPC model of an image without georeferencing maps geographic
// coordinates; its block names them with this text.
constexpr const char *kUngeoreferencedRpcGeosys = "LONG D0";

// The image file of channel 1, or null when there is none or it cannot be
// opened.
FILE *FirstImage(ZirOdi2CalibImage &model) {
    model.EnsureChannels();
    ChannelRecord *first = model.FindChannel(1);
    if (first == nullptr || first->band == nullptr)
        return nullptr;
    return model.OpenBand(*first->band);
}

// The coordinate system and transform of the image; a missing image counts
// as one without georeferencing ("PIXEL").
ProjInfo_t ImageProjection(FILE *image) {
    ProjInfo_t projection;
    InitProjInfo(&projection, 0);
    if (image != nullptr)
        VXBProjectionIO(image, 0, &projection);
    return projection;
}

// Ties the RPC record to the image's coordinate system: its text, and for a
// projected system a unit transform with the image's projection parameters.
void AdoptCoordinateSystem(RFInfo_t &record, const ProjInfo_t &image) {
    const int32_t code = DecodeGeosys(image.geosys, nullptr);
    if (record.geosys != nullptr) {
        const char *text =
            code == kGeosysPixel ? kUngeoreferencedRpcGeosys : image.geosys;
        const size_t size = strnlen(text, kGeosysTextSize - 1);
        std::memcpy(record.geosys, text, size);
        record.geosys[size] = '\0';
    }
    if (RequiresProjInfo(code) == 0 || record.projection == nullptr)
        return;
    Geosys2ProjInfo(record.projection, record.geosys, 0.0, 0.0, 1.0, 1.0);
    std::unique_ptr<char, FreeDeleter> parameters(ProjInfo2Parms(&image));
    ProjParms2Info(parameters.get(), record.projection);
}

} // namespace

void ZirOdi2CalibImage::RpcBinarySegment(int32_t offset, int32_t length,
                                         unsigned char *buffer) {
    FILE *image = FirstImage(*this);
    if (rationalFunctions == nullptr) {
        if (image != nullptr)
            VXBBinaryIO(image, 0, 1, offset, length, buffer);
        return;
    }
    AdoptCoordinateSystem(*rationalFunctions, ImageProjection(image));
    int32_t blockLength = 0;
    std::unique_ptr<unsigned char, FreeDeleter> block(
        VXBRFInfoToBinary(rationalFunctions, &blockLength));
    // The whole block is the segment, whatever the offset; the caller's
    // buffer holds the requested length and not a byte more.
    const int32_t copied = std::min(blockLength, length);
    if (block == nullptr || buffer == nullptr || copied <= 0)
        return;
    std::memcpy(buffer, block.get(), static_cast<size_t>(copied));
}

// The length of what RpcBinarySegment serves: with an RPC model its RF
// block, whatever RPC tags the image file carries; without one the image
// file's own segment, or an RF block's length when there is no image to ask.
int32_t ZirOdi2CalibImage::RpcBinaryLength() {
    if (rationalFunctions != nullptr)
        return kRFBlockSize;
    FILE *image = FirstImage(*this);
    if (image == nullptr)
        return kRFBlockSize;
    return VXBGetBinaryLength(image, 1);
}
