// Pixel reads of the dataset: each channel is read from its polarization's
// image file through the host, then converted to the sample layout the
// dataset announced and, for calibrated products, to backscatter.

#include "host/HostMemory.hpp"
#include "model/ZirOdi2CalibImage.hpp"

#include "host/ErrorReports.hpp"
#include "host/RasterServices.hpp"
#include "host/TextServices.hpp"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <limits>
#include <map>
#include <memory>
#include <new>
#include <string>
#include <strings.h>
#include <vector>

namespace {

using host::FreeDeleter;

template <typename T> using HostArray = std::unique_ptr<T[], FreeDeleter>;

// The planes of one detected real read, by channel number.
using PlaneSet = std::map<int32_t, HostArray<float>>;

// The complex read reads its source rows in slices of at most this many
// bytes, so its memory does not grow with the window.
constexpr std::size_t kComplexSliceBytes = std::size_t{1} << 20;

// In-phase and quadrature are channels 1 and 2 of a complex image file.
constexpr int32_t kComplexChannels[2] = {1, 2};

// Element count of an array of count1 x count2 x count3 elements, or 0 when
// a count is not positive or the array could not be addressed in bytes (the
// limit leaves room for elements of up to 8 bytes).
std::size_t ElementCount(int64_t count1, int64_t count2, int64_t count3 = 1) {
    if (count1 <= 0 || count2 <= 0 || count3 <= 0)
        return 0;
    const auto limit = std::numeric_limits<std::size_t>::max() / 8;
    auto a = static_cast<std::size_t>(count1);
    auto b = static_cast<std::size_t>(count2);
    auto c = static_cast<std::size_t>(count3);
    if (a > limit / b || a * b > limit / c)
        return 0;
    return a * b * c;
}

// The report of a read that could not get its scratch memory.
constexpr int32_t kErrOutOfMemory = 12;
// The report of a request the dataset cannot serve as asked.
constexpr int32_t kErrCannotServe = 5;

const char *ProductName(const ZirOdi2CalibImage &model) {
    const char *product = model.GetProductDirectory();
    return product != nullptr ? product : "";
}

// Scratch memory of the host allocator. Memory that cannot be had (count 0
// stands for a size too large to address) throws std::bad_alloc, which the
// reads turn into an error report: a read must not go on without its
// scratch, nor end silently with the caller's buffer half written.
template <typename T> HostArray<T> AllocateHost(std::size_t count) {
    HostArray<T> memory(
        count == 0 ? nullptr : static_cast<T *>(HMalloc(count * sizeof(T))));
    if (!memory)
        throw std::bad_alloc();
    return memory;
}

// Runs a read; running out of memory anywhere in it, in the host allocator
// or a container, ends the request with an error naming the product.
template <typename Read>
void ReportingOutOfMemory(const ZirOdi2CalibImage &model, Read read) {
    try {
        read();
    } catch (const std::bad_alloc &) {
        IMPError(kErrOutOfMemory, host::kError, "out of memory reading %s",
                 ProductName(model));
    }
}

// A null calibration kind means no table was ever selected, the same as
// "None".
bool IsCalibrated(const char *calibrationType) {
    return calibrationType != nullptr &&
           strcasecmp(calibrationType, "None") != 0;
}

// A request with nothing to read is refused rather than answered with an
// untouched buffer.
void RequireRequest(const ZirOdi2CalibImage &model, int32_t xSize,
                    int32_t ySize, int32_t bufferXSize, int32_t bufferYSize,
                    int32_t channelCount, const int32_t *channelList) {
    if (xSize <= 0 || ySize <= 0 || bufferXSize <= 0 || bufferYSize <= 0 ||
        channelCount <= 0 || channelList == nullptr)
        IMPError(kErrCannotServe, host::kError,
                 "%s: window %dx%d to %dx%d with %d channels is empty",
                 ProductName(model), xSize, ySize, bufferXSize, bufferYSize,
                 channelCount);
}

// Why a channel has no image, as its band remembers it.
std::string ImageFailure(const BandRecord *band) {
    if (band == nullptr || band->fileName == nullptr || *band->fileName == '\0')
        return "product.xml names no image file for it";
    if (!band->failure.empty())
        return band->failure;
    return std::string("cannot open ") + band->fileName;
}

// The image file of every listed channel, in list order. A read either
// writes every sample it was asked for or reports why it cannot: a channel
// that does not exist or whose image cannot be opened (VXBOpen or the band
// has warned why) ends the request before anything is written.
std::vector<FILE *> RequireChannelImages(ZirOdi2CalibImage &model,
                                         int32_t channelCount,
                                         const int32_t *channelList) {
    std::vector<FILE *> images;
    images.reserve(static_cast<std::size_t>(channelCount));
    for (int32_t c = 0; c < channelCount; ++c) {
        ChannelRecord *record = model.FindChannel(channelList[c]);
        if (record == nullptr) {
            IMPError(kErrCannotServe, host::kError, "%s has no channel %d",
                     ProductName(model), channelList[c]);
            return {};
        }
        FILE *image =
            record->band != nullptr ? model.OpenBand(*record->band) : nullptr;
        if (image == nullptr)
            IMPError(kErrCannotServe, host::kError, "channel %d: %s",
                     channelList[c], ImageFailure(record->band).c_str());
        images.push_back(image);
    }
    return images;
}

// Two 16-bit halves of a complex sample as one word, in-phase low.
int32_t PackComplex(int32_t inPhase, int32_t quadrature) {
    const uint32_t low = static_cast<uint32_t>(inPhase) & 0xFFFFu;
    const uint32_t high = static_cast<uint32_t>(quadrature) & 0xFFFFu;
    return static_cast<int32_t>(low | (high << 16));
}

// The source index of output index k when size samples are spread over the
// output by ratio: truncated toward zero, held at the last sample.
int32_t SourceIndex(int32_t k, float ratio, int32_t size) {
    const double scaled =
        std::trunc(static_cast<double>(static_cast<float>(k) * ratio));
    if (scaled >= static_cast<double>(size))
        return size - 1;
    return static_cast<int32_t>(scaled);
}

// Calibrates a detected plane read from the window at xOffset. The gains
// belong to image columns; when the host resampled the window, output column
// k holds image column xOffset + floor(k * xSize / bufferXSize), so each
// output column is calibrated with the gain of the column it came from.
void CalibrateDetectedPlane(ZirOdi2CalibImage &model, int32_t xOffset,
                            int32_t yOffset, int32_t xSize, int32_t bufferXSize,
                            int32_t bufferYSize, float *plane) {
    if (bufferXSize == xSize) {
        model.CalibrateDetected(xOffset, yOffset, bufferXSize, bufferYSize,
                                plane);
        return;
    }
    const auto width = static_cast<std::size_t>(bufferXSize);
    std::vector<float> column(static_cast<std::size_t>(bufferYSize));
    for (int32_t k = 0; k < bufferXSize; ++k) {
        const int64_t source =
            xOffset + static_cast<int64_t>(k) * xSize / bufferXSize;
        for (std::size_t r = 0; r < column.size(); ++r)
            column[r] = plane[r * width + static_cast<std::size_t>(k)];
        model.CalibrateDetected(static_cast<int32_t>(source), yOffset, 1,
                                bufferYSize, column.data());
        for (std::size_t r = 0; r < column.size(); ++r)
            plane[r * width + static_cast<std::size_t>(k)] = column[r];
    }
}

void ReadDetectedPlanes(ZirOdi2CalibImage &model, int32_t mode, int32_t xOffset,
                        int32_t yOffset, int32_t xSize, int32_t ySize,
                        PlaneSet &planes, int32_t bufferXSize,
                        int32_t bufferYSize, int32_t channelCount,
                        const int32_t *channelList) {
    const std::vector<FILE *> images =
        RequireChannelImages(model, channelCount, channelList);
    const std::size_t pixels = ElementCount(bufferXSize, bufferYSize);
    const bool calibrated = IsCalibrated(model.GetCalibrationType());
    for (int32_t c = 0; c < channelCount; ++c) {
        const int32_t channel = channelList[c];
        if (planes.count(channel) != 0)
            continue;
        HostArray<float> plane = AllocateHost<float>(pixels);
        VXBReal32ChanIO(images[static_cast<std::size_t>(c)], mode, xOffset,
                        yOffset, xSize, ySize, plane.get(), bufferXSize,
                        bufferYSize, 1,
                        &model.FindChannel(channel)->bandChannel);
        if (calibrated)
            CalibrateDetectedPlane(model, xOffset, yOffset, xSize, bufferXSize,
                                   bufferYSize, plane.get());
        planes.emplace(channel, std::move(plane));
    }
}

void InterleavePlanes(float *buffer, const PlaneSet &planes,
                      int32_t bufferXSize, int32_t bufferYSize,
                      int32_t channelCount, const int32_t *channelList) {
    if (buffer == nullptr)
        return;
    const std::size_t pixels = ElementCount(bufferXSize, bufferYSize);
    const auto stride = static_cast<std::size_t>(channelCount);
    std::vector<const float *> sources(stride);
    for (int32_t c = 0; c < channelCount; ++c) {
        const auto found = planes.find(channelList[c]);
        sources[static_cast<std::size_t>(c)] =
            found != planes.end() ? found->second.get() : nullptr;
    }
    // Two channels (a dual-polarization product) are interleaved pairwise,
    // which the compiler turns into vector shuffles.
    if (stride == 2 && sources[0] != nullptr && sources[1] != nullptr) {
        const float *first = sources[0];
        const float *second = sources[1];
        for (std::size_t p = 0; p < pixels; ++p) {
            buffer[2 * p] = first[p];
            buffer[2 * p + 1] = second[p];
        }
        return;
    }
    for (std::size_t c = 0; c < stride; ++c) {
        float *out = buffer + c;
        const float *plane = sources[c];
        for (std::size_t p = 0; p < pixels; ++p)
            out[p * stride] = plane[p];
    }
}

// Where each output column of a complex read takes its sample and gain.
struct ColumnMap {
    std::vector<int32_t> source; // column within the window
    std::vector<float> gain;     // calibration gain of that image column
};

ColumnMap MapComplexColumns(const LookupTable &gains, int32_t xOffset,
                            int32_t xSize, int32_t bufferXSize) {
    const float ratio =
        static_cast<float>(xSize) / static_cast<float>(bufferXSize);
    ColumnMap map;
    map.source.resize(static_cast<std::size_t>(bufferXSize));
    map.gain.resize(static_cast<std::size_t>(bufferXSize));
    for (int32_t x = 0; x < bufferXSize; ++x) {
        const int32_t sx = SourceIndex(x, ratio, xSize);
        map.source[static_cast<std::size_t>(x)] = sx;
        map.gain[static_cast<std::size_t>(x)] = gains.Get(
            static_cast<std::size_t>(xOffset) + static_cast<std::size_t>(sx));
    }
    return map;
}

// Reads one complex channel: the output rows are taken from the window by
// nearest neighbour. Only the source rows some output row needs are read,
// consecutive ones together up to a slice of bounded size, so a decimated
// preview of a large window costs a few rows of memory, not the window.
void ReadComplexChannel(FILE *image, int32_t mode, int32_t xOffset,
                        int32_t yOffset, int32_t xSize, int32_t ySize,
                        float *buffer, int32_t bufferYSize,
                        const ColumnMap &columns, int32_t channelCount,
                        int32_t position, int32_t *slice, int32_t sliceRows) {
    const float rowRatio =
        static_cast<float>(ySize) / static_cast<float>(bufferYSize);
    const std::size_t bufferXSize = columns.source.size();
    const auto rowLength = static_cast<std::size_t>(xSize) * 2;
    int32_t y = 0;
    while (y < bufferYSize) {
        const int32_t first = SourceIndex(y, rowRatio, ySize);
        int32_t last = first;
        int32_t end = y + 1;
        for (; end < bufferYSize; ++end) {
            const int32_t next = SourceIndex(end, rowRatio, ySize);
            if (next > last + 1 || next - first >= sliceRows)
                break;
            last = next;
        }
        const int32_t rows = last - first + 1;
        VXBInt32ChanIO(image, mode, xOffset, yOffset + first, xSize, rows,
                       slice, xSize, rows, 2, kComplexChannels);
        for (; y < end; ++y) {
            const int32_t *row =
                slice + static_cast<std::size_t>(
                            SourceIndex(y, rowRatio, ySize) - first) *
                            rowLength;
            for (std::size_t x = 0; x < bufferXSize; ++x) {
                const auto sx = static_cast<std::size_t>(columns.source[x]);
                const float gain = columns.gain[x];
                const std::size_t k =
                    (static_cast<std::size_t>(y) * bufferXSize + x) *
                        static_cast<std::size_t>(channelCount) +
                    static_cast<std::size_t>(position);
                buffer[2 * k] = static_cast<float>(row[2 * sx]) / gain;
                buffer[2 * k + 1] = static_cast<float>(row[2 * sx + 1]) / gain;
            }
        }
    }
}

// The complex real read: in-phase and quadrature divided by the gain of
// their image column. Uncalibrated products have an empty table, so every
// gain is 1.0 and the raw values come back as floats.
void ReadComplexReal(ZirOdi2CalibImage &model, int32_t mode, int32_t xOffset,
                     int32_t yOffset, int32_t xSize, int32_t ySize,
                     float *buffer, int32_t bufferXSize, int32_t bufferYSize,
                     int32_t channelCount, const int32_t *channelList) {
    const std::size_t rowElements = ElementCount(xSize, 2);
    const std::size_t rowBytes = rowElements * sizeof(int32_t);
    const auto sliceRows = static_cast<int32_t>(std::min<std::size_t>(
        std::max<std::size_t>(1, kComplexSliceBytes / rowBytes),
        static_cast<std::size_t>(ySize)));
    HostArray<int32_t> slice = AllocateHost<int32_t>(
        ElementCount(static_cast<int64_t>(rowElements), sliceRows));
    const ColumnMap columns = MapComplexColumns(model.CalibrationTable(),
                                                xOffset, xSize, bufferXSize);
    const std::vector<FILE *> images =
        RequireChannelImages(model, channelCount, channelList);
    for (int32_t c = 0; c < channelCount; ++c) {
        ReadComplexChannel(images[static_cast<std::size_t>(c)], mode, xOffset,
                           yOffset, xSize, ySize, buffer, bufferYSize, columns,
                           channelCount, c, slice.get(), sliceRows);
    }
}

// The integer read: detected samples as they are, complex ones packed into
// one word each.
void ReadIntegerSamples(ZirOdi2CalibImage &model, int32_t mode, int32_t xOffset,
                        int32_t yOffset, int32_t xSize, int32_t ySize,
                        int32_t *buffer, int32_t bufferXSize,
                        int32_t bufferYSize, int32_t channelCount,
                        const int32_t *channelList) {
    const bool complex =
        model.GetProductType() == static_cast<int32_t>(ProductType::SLC);
    const int32_t samplesPerPixel = complex ? 2 : 1;
    const std::vector<FILE *> images =
        RequireChannelImages(model, channelCount, channelList);
    const std::size_t pixels = ElementCount(bufferXSize, bufferYSize);
    HostArray<int32_t> scratch = AllocateHost<int32_t>(
        ElementCount(bufferXSize, bufferYSize, samplesPerPixel));
    const auto stride = static_cast<std::size_t>(channelCount);
    for (int32_t c = 0; c < channelCount; ++c) {
        VXBInt32ChanIO(images[static_cast<std::size_t>(c)], mode, xOffset,
                       yOffset, xSize, ySize, scratch.get(), bufferXSize,
                       bufferYSize, samplesPerPixel, kComplexChannels);
        const int32_t *in = scratch.get();
        int32_t *out = buffer + c;
        for (std::size_t p = 0; p < pixels; ++p)
            out[p * stride] =
                complex ? PackComplex(in[2 * p], in[2 * p + 1]) : in[p];
    }
}

} // namespace

void ZirOdi2CalibImage::ReadIntegerChannels(
    int32_t mode, int32_t xOffset, int32_t yOffset, int32_t xSize,
    int32_t ySize, int32_t *buffer, int32_t bufferXSize, int32_t bufferYSize,
    int32_t channelCount, const int32_t *channelList) {
    if (buffer == nullptr)
        return;
    EnsureChannels();
    // Calibrated products announce real channels, which the real read serves.
    if (IsCalibrated(GetCalibrationType()))
        IMPError(kErrCannotServe, host::kError,
                 "%s is calibrated to %s: its channels are real values, read "
                 "with the real read",
                 ProductName(*this), GetCalibrationType());
    RequireRequest(*this, xSize, ySize, bufferXSize, bufferYSize, channelCount,
                   channelList);
    ReportingOutOfMemory(*this, [&] {
        ReadIntegerSamples(*this, mode, xOffset, yOffset, xSize, ySize, buffer,
                           bufferXSize, bufferYSize, channelCount, channelList);
    });
}

void ZirOdi2CalibImage::ReadRealChannels(
    int32_t mode, int32_t xOffset, int32_t yOffset, int32_t xSize,
    int32_t ySize, float *buffer, int32_t bufferXSize, int32_t bufferYSize,
    int32_t channelCount, const int32_t *channelList) {
    if (buffer == nullptr)
        return;
    EnsureChannels();
    RequireRequest(*this, xSize, ySize, bufferXSize, bufferYSize, channelCount,
                   channelList);
    ReportingOutOfMemory(*this, [&] {
        if (GetProductType() == static_cast<int32_t>(ProductType::SLC)) {
            ReadComplexReal(*this, mode, xOffset, yOffset, xSize, ySize, buffer,
                            bufferXSize, bufferYSize, channelCount,
                            channelList);
            return;
        }
        // Every plane is read before the caller's buffer is written, so a
        // read that runs out of memory leaves the buffer untouched.
        PlaneSet planes;
        ReadDetectedPlanes(*this, mode, xOffset, yOffset, xSize, ySize, planes,
                           bufferXSize, bufferYSize, channelCount, channelList);
        InterleavePlanes(buffer, planes, bufferXSize, bufferYSize, channelCount,
                         channelList);
    });
}
