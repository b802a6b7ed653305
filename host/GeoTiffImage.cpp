#include "host/GeoTiffImage.hpp"

#include "host/ErrorReports.hpp"
#include "host/TiffBlocks.hpp"
#include "host/TiffFile.hpp"
#include "host/TiffGeoreferencing.hpp"

#include <cmath>
#include <cstddef>
#include <cstring>
#include <limits>
#include <new>
#include <type_traits>
#include <unistd.h>

// Window reads. Output pixel (k, j) comes from source pixel
// (xoff + floor(k * xsize / dstx), yoff + floor(j * ysize / dsty)); only the
// strips or tiles holding those pixels are decoded, one row of blocks at a
// time, converted straight into the output.
//
// A refused request writes nothing: the window, sizes and channels are
// checked before the first byte is written. So does a decoding failure:
// the blocks are checked to lie inside the file before anything is
// allocated or written (compressed ones also to store enough bytes for their
// declared size), the memory for them is taken from the process's budget for
// decoded blocks before the first one is decoded, and compressed ones (whose
// data can turn out corrupt midway) are converted into a scratch copy of the
// output that reaches dst only once every block decoded. Only a file changed on
// disk during the read can still leave dst partly written.
//
// Conversions: to float, every value as the nearest float; to int32, integers
// as they are (uint32 values above INT32_MAX clamp to it), floats rounded to
// the nearest integer and clamped to the int32 range, NaN as 0.

namespace host {
namespace {

[[noreturn]] void RefuseRequest(const std::string &path,
                                const std::string &what) {
    throw ReportedError(kErrBadRequest, kError, path + ": " + what);
}

std::string WindowText(const WindowRequest &window) {
    return std::to_string(window.xoff) + "," + std::to_string(window.yoff) +
           " " + std::to_string(window.xsize) + "x" +
           std::to_string(window.ysize) + " to " + std::to_string(window.dstx) +
           "x" + std::to_string(window.dsty);
}

// Elements in the output of a request; refuses outputs no address space
// can hold.
size_t OutputElements(const std::string &path, const WindowRequest &window,
                      size_t channelCount, size_t elementBytes) {
    size_t elements = 0;
    size_t bytes = 0;
    if (__builtin_mul_overflow(size_t(window.dstx), size_t(window.dsty),
                               &elements) ||
        __builtin_mul_overflow(elements, channelCount, &elements) ||
        __builtin_mul_overflow(elements, elementBytes, &bytes) ||
        bytes > size_t(std::numeric_limits<ptrdiff_t>::max()))
        RefuseRequest(path, "output of " + WindowText(window) + " is too big");
    return elements;
}

void CheckWindow(const std::string &path, const TiffLayout &layout,
                 const WindowRequest &window) {
    if (window.xsize <= 0 || window.ysize <= 0 || window.dstx <= 0 ||
        window.dsty <= 0)
        RefuseRequest(path, "window " + WindowText(window) + " is empty");
    if (window.xoff < 0 || window.yoff < 0 ||
        int64_t(window.xoff) + window.xsize > layout.width ||
        int64_t(window.yoff) + window.ysize > layout.height)
        RefuseRequest(path, "window " + WindowText(window) +
                                " is outside the " +
                                std::to_string(layout.width) + "x" +
                                std::to_string(layout.height) + " image");
}

template <typename Out>
void CheckRequest(const std::string &path, const TiffLayout &layout,
                  const WindowRequest &window,
                  const std::vector<int32_t> &channels, const Out *dst) {
    if (dst == nullptr)
        RefuseRequest(path, "no output buffer");
    if (channels.empty())
        RefuseRequest(path, "no channels requested");
    CheckWindow(path, layout, window);
    for (int32_t channel : channels)
        if (channel < 1 || channel > layout.ChannelCount())
            RefuseRequest(path, "channel " + std::to_string(channel) +
                                    " does not exist (" +
                                    std::to_string(layout.ChannelCount()) +
                                    " channels)");
    OutputElements(path, window, channels.size(), sizeof(Out));
}

int64_t SourceIndex(int32_t offset, int32_t size, int32_t outputSize,
                    int64_t k) {
    return offset + k * size / outputSize;
}

struct ChannelSource {
    uint32_t plane;
    uint32_t element; // within a pixel of the plane
};

// Where each output column and channel of a request comes from.
struct WindowPlan {
    // Per output column: element offset of its pixel in a row of blocks.
    std::vector<size_t> columnOffsets;
    // The output columns are the window's columns one by one, in one block
    // (a full-resolution read of a stripped file).
    bool unitColumns = false;
    std::vector<bool> neededColumns; // per block column
    std::vector<ChannelSource> channels;
    std::vector<bool> neededPlanes;
    std::vector<uint32_t> sourceLines; // per output line
};

WindowPlan MakePlan(const TiffLayout &layout, const WindowRequest &window,
                    const std::vector<int32_t> &channels) {
    WindowPlan plan;
    plan.neededColumns.assign(layout.blocksAcross, false);
    plan.unitColumns = window.dstx == window.xsize && layout.blocksAcross == 1;
    // Unit columns are copied as one run: the per-column offsets, a 64-bit
    // division each, would cost as much as the copy itself.
    if (plan.unitColumns) {
        plan.neededColumns[0] = true;
    } else {
        plan.columnOffsets.resize(size_t(window.dstx));
        for (int64_t k = 0; k < window.dstx; ++k) {
            const auto x = static_cast<uint32_t>(
                SourceIndex(window.xoff, window.xsize, window.dstx, k));
            const uint32_t column = x / layout.blockWidth;
            plan.neededColumns[column] = true;
            plan.columnOffsets[size_t(k)] =
                column * layout.BlockStride() +
                size_t(x % layout.blockWidth) * layout.ElementsPerPixel();
        }
    }
    plan.neededPlanes.assign(layout.PlaneCount(), false);
    for (int32_t channel : channels) {
        const auto index = static_cast<uint32_t>(channel - 1);
        const ChannelSource source =
            layout.separatePlanes
                ? ChannelSource{index / layout.elementsPerSample,
                                index % layout.elementsPerSample}
                : ChannelSource{0, index};
        plan.channels.push_back(source);
        plan.neededPlanes[source.plane] = true;
    }
    plan.sourceLines.resize(size_t(window.dsty));
    for (int64_t j = 0; j < window.dsty; ++j)
        plan.sourceLines[size_t(j)] = static_cast<uint32_t>(
            SourceIndex(window.yoff, window.ysize, window.dsty, j));
    return plan;
}

std::vector<uint32_t> NeededBlockRows(const TiffLayout &layout,
                                      const WindowPlan &plan) {
    std::vector<uint32_t> rows;
    for (uint32_t line : plan.sourceLines)
        if (rows.empty() || rows.back() != line / layout.blockHeight)
            rows.push_back(line / layout.blockHeight);
    return rows;
}

template <typename Out, typename Element> Out ConvertSample(Element value) {
    if constexpr (std::is_same_v<Out, float>) {
        return static_cast<float>(value);
    } else if constexpr (std::is_floating_point_v<Element>) {
        if (std::isnan(value))
            return 0;
        if (value >= 2147483647.0f)
            return std::numeric_limits<int32_t>::max();
        if (value <= -2147483648.0f)
            return std::numeric_limits<int32_t>::min();
        return static_cast<int32_t>(std::lround(value));
    } else if constexpr (std::is_same_v<Element, uint32_t>) {
        return static_cast<int32_t>(
            std::min<uint32_t>(value, std::numeric_limits<int32_t>::max()));
    } else {
        return value;
    }
}

// One channel of one output line from consecutive source pixels.
template <typename Out, typename Element>
void ConvertRun(const Element *source, size_t sourceStep, Out *out,
                size_t outStep, size_t count) {
    if (sourceStep == 1 && outStep == 1) {
        for (size_t k = 0; k < count; ++k)
            out[k] = ConvertSample<Out>(source[k]);
        return;
    }
    for (size_t k = 0; k < count; ++k)
        out[k * outStep] = ConvertSample<Out>(source[k * sourceStep]);
}

// One channel of one output line from resampled source pixels.
template <typename Out, typename Element>
void ConvertGathered(const Element *source, const size_t *offsets, Out *out,
                     size_t outStep, size_t count) {
    for (size_t k = 0; k < count; ++k)
        out[k * outStep] = ConvertSample<Out>(source[offsets[k]]);
}

template <typename Element, typename Out>
void CopyWindow(TiffBlockCache &cache, const TiffLayout &layout,
                const WindowRequest &window, const WindowPlan &plan, Out *out) {
    const size_t channelCount = plan.channels.size();
    const size_t lineLength = size_t(window.dstx) * channelCount;
    const size_t pixelElements = layout.ElementsPerPixel();
    std::vector<const Element *> planeLines(layout.PlaneCount());
    for (uint32_t line : plan.sourceLines) {
        const uint32_t blockRow = line / layout.blockHeight;
        const size_t lineInBlock = line % layout.blockHeight;
        for (uint32_t plane = 0; plane < layout.PlaneCount(); ++plane)
            if (plan.neededPlanes[plane])
                planeLines[plane] =
                    reinterpret_cast<const Element *>(
                        cache.Load(plane, blockRow, plan.neededColumns)) +
                    lineInBlock * layout.RowStride();
        for (size_t c = 0; c < channelCount; ++c) {
            const ChannelSource &source = plan.channels[c];
            const Element *sourceLine =
                planeLines[source.plane] + source.element;
            if (plan.unitColumns)
                ConvertRun(sourceLine + size_t(window.xoff) * pixelElements,
                           pixelElements, out + c, channelCount,
                           size_t(window.dstx));
            else
                ConvertGathered(sourceLine, plan.columnOffsets.data(), out + c,
                                channelCount, size_t(window.dstx));
        }
        out += lineLength;
    }
}

template <typename Out>
void CopyWindowOfType(TiffBlockCache &cache, const TiffLayout &layout,
                      const WindowRequest &window, const WindowPlan &plan,
                      Out *out) {
    switch (layout.element) {
    case ElementType::UInt8:
        return CopyWindow<uint8_t>(cache, layout, window, plan, out);
    case ElementType::Int8:
        return CopyWindow<int8_t>(cache, layout, window, plan, out);
    case ElementType::UInt16:
        return CopyWindow<uint16_t>(cache, layout, window, plan, out);
    case ElementType::Int16:
        return CopyWindow<int16_t>(cache, layout, window, plan, out);
    case ElementType::UInt32:
        return CopyWindow<uint32_t>(cache, layout, window, plan, out);
    case ElementType::Int32:
        return CopyWindow<int32_t>(cache, layout, window, plan, out);
    case ElementType::Float32:
        return CopyWindow<float>(cache, layout, window, plan, out);
    }
}

} // namespace

struct GeoTiffImage::State {
    explicit State(const std::string &path)
        : file(path), layout(ReadTiffLayout(file)), cache(file, layout),
          georeferencing(
              ReadTiffGeoreferencing(file, layout.width, layout.height)) {}

    template <typename Out>
    void Read(const WindowRequest &window, const std::vector<int32_t> &channels,
              Out *dst);

    TiffFile file;
    TiffLayout layout;
    TiffBlockCache cache;
    TiffGeoreferencing georeferencing;
};

template <typename Out>
void GeoTiffImage::State::Read(const WindowRequest &window,
                               const std::vector<int32_t> &channels, Out *dst) {
    CheckRequest(file.Path(), layout, window, channels, dst);
    try {
        const WindowPlan plan = MakePlan(layout, window, channels);
        cache.CheckStoredInFile(NeededBlockRows(layout, plan),
                                plan.neededPlanes, plan.neededColumns);
        cache.Reserve(plan.neededPlanes);
        if (!layout.compressed) {
            CopyWindowOfType(cache, layout, window, plan, dst);
            return;
        }
        std::vector<Out> scratch(
            OutputElements(file.Path(), window, channels.size(), sizeof(Out)));
        CopyWindowOfType(cache, layout, window, plan, scratch.data());
        std::memcpy(dst, scratch.data(), scratch.size() * sizeof(Out));
    } catch (const std::bad_alloc &) {
        RefuseRequest(file.Path(),
                      "not enough memory to read window " + WindowText(window));
    }
}

GeoTiffImage::GeoTiffImage(std::unique_ptr<State> stateIn)
    : state(std::move(stateIn)) {}

GeoTiffImage::~GeoTiffImage() = default;

std::unique_ptr<GeoTiffImage> GeoTiffImage::Open(const std::string &path) {
    try {
        return std::unique_ptr<GeoTiffImage>(
            new GeoTiffImage(std::make_unique<State>(path)));
    } catch (const std::bad_alloc &) {
        throw ReportedError(kErrUnreadableFile, kError,
                            path + ": not enough memory to open it");
    }
}

const std::string &GeoTiffImage::Path() const { return state->file.Path(); }

int32_t GeoTiffImage::Width() const { return state->layout.width; }

int32_t GeoTiffImage::Height() const { return state->layout.height; }

int32_t GeoTiffImage::ChannelCount() const {
    return state->layout.ChannelCount();
}

int32_t GeoTiffImage::ChannelType() const { return state->layout.channelType; }

StoredSamples GeoTiffImage::Samples() const {
    const TiffLayout &layout = state->layout;
    return {layout.sampleFormat, layout.bitsPerSample,
            static_cast<int32_t>(layout.samplesPerPixel)};
}

void GeoTiffImage::CheckWindow(const WindowRequest &window) const {
    host::CheckWindow(state->file.Path(), state->layout, window);
}

void GeoTiffImage::ReadInt32(const WindowRequest &window,
                             const std::vector<int32_t> &channels,
                             int32_t *dst) {
    state->Read(window, channels, dst);
}

void GeoTiffImage::ReadReal32(const WindowRequest &window,
                              const std::vector<int32_t> &channels,
                              float *dst) {
    state->Read(window, channels, dst);
}

ProjInfo_t GeoTiffImage::Projection() const {
    return state->georeferencing.projection;
}

std::string GeoTiffImage::TiePointGeosys() const {
    return state->georeferencing.tiePointGeosys;
}

const std::vector<TiePoint> &GeoTiffImage::TiePoints() const {
    return state->georeferencing.tiePoints;
}

const std::vector<unsigned char> &GeoTiffImage::RpcBlock() const {
    return state->georeferencing.rpcBlock;
}

bool HasTiffSignature(const std::string &path) {
    static const unsigned char kSignatures[][4] = {
        {'I', 'I', 42, 0},
        {'M', 'M', 0, 42}, // classic TIFF
        {'I', 'I', 43, 0},
        {'M', 'M', 0, 43}, // BigTIFF
    };
    unsigned char start[4] = {};
    const int descriptor = OpenRegularFile(path);
    if (descriptor < 0)
        return false;
    const ssize_t got = read(descriptor, start, sizeof start);
    close(descriptor);
    if (got != static_cast<ssize_t>(sizeof start))
        return false;
    for (const auto &signature : kSignatures)
        if (std::memcmp(start, signature, sizeof start) == 0)
            return true;
    return false;
}

} // namespace host
