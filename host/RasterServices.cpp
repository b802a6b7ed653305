#include "host/RasterServices.hpp"

#include "host/DriverRegistry.hpp"
#include "host/ErrorReports.hpp"
#include "host/RasterHandle.hpp"

#include <algorithm>
#include <cstring>
#include <strings.h>
#include <sys/stat.h>
#include <vector>

using host::RasterHandle;

namespace {

// Error codes of the raster services.
constexpr int32_t kErrInvalidHandle = 2;
constexpr int32_t kErrReadOnly = 4;
constexpr int32_t kErrBadRequest = 5;
constexpr int32_t kErrInvalidSegment = 11;

RasterHandle &RequireHandle(FILE *fp) {
    RasterHandle *handle = host::LookupHandle(fp);
    if (handle == nullptr)
        IMPError(kErrInvalidHandle, host::kError, "invalid raster handle %p",
                 static_cast<void *>(fp));
    return *handle;
}

void RequireReadMode(int32_t mode, const RasterHandle &handle) {
    if (mode != 0)
        IMPError(kErrReadOnly, host::kError, "%s is open for reading only",
                 handle.name.c_str());
}

const DriverTable &RequireDriver() {
    const DriverTable *table = host::ActiveDriver();
    if (table == nullptr)
        IMPError(kErrInvalidHandle, host::kError, "no raster driver loaded");
    return *table;
}

bool IsDriverDataset(const RasterHandle &handle) {
    return handle.kind == RasterHandle::Kind::DriverDataset;
}

// A driver's answers can only be trusted for requests that fit the raster it
// declared, so the host checks windows and channels before passing them on.
void CheckDatasetWindow(const RasterHandle &handle, int32_t xoff, int32_t yoff,
                        int32_t xsize, int32_t ysize, const void *dst,
                        int32_t dstx, int32_t dsty, int32_t nchan,
                        const int32_t *chanlist) {
    const char *name = handle.name.c_str();
    if (dst == nullptr || chanlist == nullptr)
        IMPError(kErrBadRequest, host::kError, "%s: no buffer or channel list",
                 name);
    if (xsize <= 0 || ysize <= 0 || dstx <= 0 || dsty <= 0 || nchan <= 0)
        IMPError(kErrBadRequest, host::kError,
                 "%s: window %dx%d to %dx%d with %d channels is empty", name,
                 xsize, ysize, dstx, dsty, nchan);
    if (xoff < 0 || yoff < 0 ||
        static_cast<int64_t>(xoff) + xsize > handle.width ||
        static_cast<int64_t>(yoff) + ysize > handle.height)
        IMPError(kErrBadRequest, host::kError,
                 "%s: window %d,%d %dx%d is outside the %dx%d raster", name,
                 xoff, yoff, xsize, ysize, handle.width, handle.height);
    for (int32_t c = 0; c < nchan; ++c)
        if (chanlist[c] < 1 || chanlist[c] > handle.channels)
            IMPError(kErrBadRequest, host::kError,
                     "%s: channel %d does not exist (%d channels)", name,
                     chanlist[c], handle.channels);
}

host::WindowRequest MakeWindow(int32_t xoff, int32_t yoff, int32_t xsize,
                               int32_t ysize, int32_t dstx, int32_t dsty) {
    return host::WindowRequest{xoff, yoff, xsize, ysize, dstx, dsty};
}

std::vector<int32_t> ChannelVector(int32_t nchan, const int32_t *chanlist) {
    if (nchan <= 0 || chanlist == nullptr)
        return {};
    return std::vector<int32_t>(chanlist, chanlist + nchan);
}

enum class PathKind { Missing, RegularFile, Other };

PathKind KindOfPath(const char *name) {
    struct stat info {};
    if (stat(name, &info) != 0)
        return PathKind::Missing;
    return S_ISREG(info.st_mode) ? PathKind::RegularFile : PathKind::Other;
}

FILE *OpenGeoTiff(const char *name) {
    try {
        auto handle = std::make_unique<RasterHandle>();
        handle->kind = RasterHandle::Kind::GeoTiff;
        handle->name = name;
        handle->image = host::GeoTiffImage::Open(name);
        return host::RegisterHandle(std::move(handle));
    } catch (const host::ReportedError &error) {
        IMPError(error.code, host::kWarning, "cannot open %s: %s", name,
                 error.what());
        return nullptr;
    }
}

FILE *OpenWithDriver(const char *name, const char *access) {
    const DriverTable *table = host::ActiveDriver();
    if (table == nullptr || table->OpenDataset == nullptr) {
        IMPError(kErrInvalidHandle, host::kWarning,
                 "cannot open %s: no raster driver loaded", name);
        return nullptr;
    }
    FILE *fp = table->OpenDataset(name, access);
    if (fp == nullptr)
        IMPError(kErrBadRequest, host::kWarning,
                 "cannot open %s: not a dataset the driver recognises", name);
    return fp;
}

void ThinTiePointsIntoGcps(const host::GeoTiffImage &image, int32_t *count,
                           int32_t *ids, double *pixels, double *lines,
                           double *pixelHeights, double *xs, double *ys,
                           double *zs) {
    const std::vector<host::TiePoint> &points = image.TiePoints();
    const size_t n = points.size();
    const size_t step = std::max<size_t>(1, (n + kMaxGcpSegmentPoints - 1) /
                                                kMaxGcpSegmentPoints);
    int32_t written = 0;
    for (size_t i = 0; i < n && written < kMaxGcpSegmentPoints; i += step) {
        ids[written] = written + 1;
        pixels[written] = points[i].pixel;
        lines[written] = points[i].line;
        pixelHeights[written] = 0.0;
        xs[written] = points[i].x;
        ys[written] = points[i].y;
        zs[written] = points[i].z;
        ++written;
    }
    *count = written;
}

void CopyText(char *dst, const std::string &text, size_t size) {
    std::strncpy(dst, text.c_str(), size - 1);
    dst[size - 1] = '\0';
}

} // namespace

FILE *fpAlloc(const char *name, int32_t, void *) {
    auto handle = std::make_unique<RasterHandle>();
    handle->kind = RasterHandle::Kind::DriverDataset;
    handle->name = name ? name : "";
    return host::RegisterHandle(std::move(handle));
}

void fpDealloc(FILE *fp) { host::UnregisterHandle(fp); }

const char *fp2filename(FILE *fp) {
    RasterHandle *handle = host::LookupHandle(fp);
    return handle ? handle->name.c_str() : nullptr;
}

void RawDefine(FILE *fp, int32_t width, int32_t height, int32_t channels,
               int32_t typeCode, int32_t, int32_t) {
    RasterHandle &handle = RequireHandle(fp);
    handle.defined = true;
    handle.width = width;
    handle.height = height;
    handle.channels = channels;
    handle.typeCode = typeCode;
}

void RawClose(FILE *fp) {
    if (RasterHandle *handle = host::LookupHandle(fp)) {
        handle->defined = false;
        handle->width = handle->height = handle->channels = 0;
        handle->typeCode = 0;
    }
}

void RawSizeInfo(FILE *fp, int32_t *width, int32_t *height, int32_t *channels) {
    RasterHandle *handle = host::LookupHandle(fp);
    bool known = handle != nullptr && handle->defined;
    if (width)
        *width = known ? handle->width : 0;
    if (height)
        *height = known ? handle->height : 0;
    if (channels)
        *channels = known ? handle->channels : 0;
}

int32_t RawChanType(FILE *fp, int32_t channel) {
    RasterHandle *handle = host::LookupHandle(fp);
    if (handle == nullptr || !handle->defined || channel < 1 ||
        channel > handle->channels)
        return 0;
    return handle->typeCode;
}

FILE *VXBOpen(const char *name, const char *access) {
    if (name == nullptr || *name == '\0') {
        IMPError(kErrBadRequest, host::kWarning, "cannot open an empty name");
        return nullptr;
    }
    if (access == nullptr || strcasecmp(access, "r") != 0) {
        IMPError(kErrReadOnly, host::kWarning,
                 "cannot open %s: access \"%s\" is not supported (read only)",
                 name, access ? access : "");
        return nullptr;
    }
    switch (KindOfPath(name)) {
    case PathKind::Other:
        IMPError(kErrBadRequest, host::kWarning,
                 "cannot open %s: not a regular file", name);
        return nullptr;
    case PathKind::RegularFile:
        if (host::HasTiffSignature(name))
            return OpenGeoTiff(name);
        break;
    case PathKind::Missing:
        break; // a dataset name with a calibration choice or a URI
    }
    return OpenWithDriver(name, access);
}

void VXBClose(FILE *fp) {
    RasterHandle *handle = host::LookupHandle(fp);
    if (handle == nullptr)
        return;
    if (IsDriverDataset(*handle)) {
        const DriverTable *table = host::ActiveDriver();
        if (table != nullptr && table->CloseDataset != nullptr)
            table->CloseDataset(fp);
    }
    // Whatever the driver did not release is released here.
    host::UnregisterHandle(fp);
}

int32_t VXBChanXSize(FILE *fp) {
    RasterHandle &handle = RequireHandle(fp);
    return handle.image ? handle.image->Width() : handle.width;
}

int32_t VXBChanYSize(FILE *fp) {
    RasterHandle &handle = RequireHandle(fp);
    return handle.image ? handle.image->Height() : handle.height;
}

int32_t VXBChanCount(FILE *fp) {
    RasterHandle &handle = RequireHandle(fp);
    return handle.image ? handle.image->ChannelCount() : handle.channels;
}

int32_t VXBChanType(FILE *fp, int32_t channel) {
    RasterHandle &handle = RequireHandle(fp);
    if (!handle.image)
        return RawChanType(fp, channel);
    if (channel < 1 || channel > handle.image->ChannelCount())
        return 0;
    return handle.image->ChannelType();
}

bool VXBSampleLayout(FILE *fp, int32_t *sampleFormat, int32_t *bitsPerSample,
                     int32_t *samplesPerPixel) {
    const RasterHandle *handle = host::LookupHandle(fp);
    const bool known = handle != nullptr && handle->image != nullptr;
    const host::StoredSamples layout =
        known ? handle->image->Samples() : host::StoredSamples{0, 0, 0};
    if (sampleFormat)
        *sampleFormat = layout.sampleFormat;
    if (bitsPerSample)
        *bitsPerSample = layout.bitsPerSample;
    if (samplesPerPixel)
        *samplesPerPixel = layout.samplesPerPixel;
    return known;
}

void VXBInt32ChanIO(FILE *fp, int32_t mode, int32_t xoff, int32_t yoff,
                    int32_t xsize, int32_t ysize, int32_t *dst, int32_t dstx,
                    int32_t dsty, int32_t nchan, const int32_t *chanlist) {
    RasterHandle &handle = RequireHandle(fp);
    RequireReadMode(mode, handle);
    if (handle.image) {
        const host::WindowRequest window =
            MakeWindow(xoff, yoff, xsize, ysize, dstx, dsty);
        handle.image->CheckWindow(window); // before the channel list is copied
        handle.image->ReadInt32(window, ChannelVector(nchan, chanlist), dst);
        return;
    }
    CheckDatasetWindow(handle, xoff, yoff, xsize, ysize, dst, dstx, dsty, nchan,
                       chanlist);
    const DriverTable &table = RequireDriver();
    if (table.IntegerChannelRead != nullptr)
        table.IntegerChannelRead(fp, mode, xoff, yoff, xsize, ysize, dst, dstx,
                                 dsty, nchan, chanlist);
}

void VXBReal32ChanIO(FILE *fp, int32_t mode, int32_t xoff, int32_t yoff,
                     int32_t xsize, int32_t ysize, float *dst, int32_t dstx,
                     int32_t dsty, int32_t nchan, const int32_t *chanlist) {
    RasterHandle &handle = RequireHandle(fp);
    RequireReadMode(mode, handle);
    if (handle.image) {
        const host::WindowRequest window =
            MakeWindow(xoff, yoff, xsize, ysize, dstx, dsty);
        handle.image->CheckWindow(window); // before the channel list is copied
        handle.image->ReadReal32(window, ChannelVector(nchan, chanlist), dst);
        return;
    }
    CheckDatasetWindow(handle, xoff, yoff, xsize, ysize, dst, dstx, dsty, nchan,
                       chanlist);
    const DriverTable &table = RequireDriver();
    if (table.RealChannelRead != nullptr)
        table.RealChannelRead(fp, mode, xoff, yoff, xsize, ysize, dst, dstx,
                              dsty, nchan, chanlist);
}

char **VXBMetaDataIO(FILE *fp, int32_t mode, int32_t objectType,
                     int32_t objectNumber, char **list) {
    RasterHandle &handle = RequireHandle(fp);
    RequireReadMode(mode, handle);
    if (!IsDriverDataset(handle))
        return list; // the built-in reader keeps no metadata lists
    const DriverTable &table = RequireDriver();
    if (table.ReadMetadata == nullptr)
        return list;
    return table.ReadMetadata(fp, mode, objectType, objectNumber, list);
}

int32_t VXBProjectionIO(FILE *fp, int32_t mode, ProjInfo_t *record) {
    RasterHandle &handle = RequireHandle(fp);
    RequireReadMode(mode, handle);
    if (record == nullptr)
        IMPError(kErrBadRequest, host::kError, "%s: no projection record",
                 handle.name.c_str());
    if (handle.image) {
        *record = handle.image->Projection();
        return DecodeGeosys(record->geosys, nullptr);
    }
    const DriverTable &table = RequireDriver();
    if (table.ReadProjection == nullptr) {
        InitProjInfo(record, 0);
        return DecodeGeosys(record->geosys, nullptr);
    }
    return table.ReadProjection(fp, mode, record);
}

void VXBGcpIO(FILE *fp, int32_t mode, int32_t segment, int32_t, int32_t *count,
              char *pixelUnits, char *groundGeosys, char *elevationUnits,
              char *groundUnits, int32_t *ids, double *pixels, double *lines,
              double *pixelHeights, double *xs, double *ys, double *zs) {
    RasterHandle &handle = RequireHandle(fp);
    RequireReadMode(mode, handle);
    if (IsDriverDataset(handle)) {
        const DriverTable &table = RequireDriver();
        if (table.ReadGcpSegment != nullptr)
            table.ReadGcpSegment(fp, mode, segment, count, pixelUnits,
                                 groundGeosys, elevationUnits, groundUnits, ids,
                                 pixels, lines, pixelHeights, xs, ys, zs);
        return;
    }
    if (segment != 1)
        IMPError(kErrInvalidSegment, host::kError, "invalid segment number");
    if (count == nullptr || pixelUnits == nullptr || groundGeosys == nullptr ||
        elevationUnits == nullptr || groundUnits == nullptr || ids == nullptr ||
        pixels == nullptr || lines == nullptr || pixelHeights == nullptr ||
        xs == nullptr || ys == nullptr || zs == nullptr)
        IMPError(kErrBadRequest, host::kError, "%s: missing GCP output",
                 handle.name.c_str());
    ThinTiePointsIntoGcps(*handle.image, count, ids, pixels, lines,
                          pixelHeights, xs, ys, zs);
    char geosys[kGeosysTextSize];
    DecodeGeosys(handle.image->TiePointGeosys().c_str(), geosys);
    CopyText(pixelUnits, "PIXEL", 6);
    CopyText(groundGeosys, geosys, kGeosysTextSize);
    CopyText(elevationUnits, "METER", 6);
    CopyText(groundUnits, "METER", 6);
}

int32_t VXBGetBinaryLength(FILE *fp, int32_t segment) {
    RasterHandle &handle = RequireHandle(fp);
    if (IsDriverDataset(handle)) {
        const DriverTable &table = RequireDriver();
        return table.BinarySegmentLength != nullptr
                   ? table.BinarySegmentLength(fp, segment)
                   : 0;
    }
    if (segment != 1)
        IMPError(kErrInvalidSegment, host::kError, "invalid segment number");
    return static_cast<int32_t>(handle.image->RpcBlock().size());
}

void VXBBinaryIO(FILE *fp, int32_t mode, int32_t segment, int32_t offset,
                 int32_t length, unsigned char *buffer) {
    RasterHandle &handle = RequireHandle(fp);
    if (IsDriverDataset(handle)) {
        const DriverTable &table = RequireDriver();
        if (table.ReadBinarySegment != nullptr)
            table.ReadBinarySegment(fp, mode, segment, offset, length, buffer);
        return;
    }
    RequireReadMode(mode, handle);
    if (segment != 1)
        IMPError(kErrInvalidSegment, host::kError, "invalid segment number");
    const std::vector<unsigned char> &block = handle.image->RpcBlock();
    if (buffer == nullptr || offset < 0 || length < 0 ||
        static_cast<size_t>(offset) + static_cast<size_t>(length) >
            block.size())
        IMPError(kErrBadRequest, host::kError,
                 "%s: bytes %d to %d are outside binary segment 1 (%zu bytes)",
                 handle.name.c_str(), offset, offset + length, block.size());
    std::copy_n(block.begin() + offset, length, buffer);
}
