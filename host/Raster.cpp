#include "host/Raster.hpp"
#include "host/HostMemory.hpp"

#include "host/DriverRegistry.hpp"
#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/RasterHandle.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"
#include "host/fileio/DataSourceFactory.hpp"
#include "host/fileio/File.hpp"
#include "host/fileio/URI.hpp"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <memory>
#include <sys/stat.h>

namespace host {
namespace {

using ListKeeper = HostList;

constexpr int32_t kErrNoDataset = 1;
constexpr int32_t kErrNoOrbit = 23;
// A request the host's raster services refuse (their code for it).
constexpr int32_t kErrBadRequest = 5;
// Long enough for nearly every line of a product description; a longer line
// is read again into a larger buffer.
constexpr int32_t kTextLineSize = 1 << 16;
// Description buffers of the driver operations hold 80 characters and a zero.
constexpr size_t kDescriptionSize = 81;
// The file a product folder is opened by.
constexpr const char *kProductDescription = "product.xml";

// Runs a host call and turns the host's reports and the driver's exceptions
// into host::Error for the application.
template <typename Call> auto Guarded(Call &&call) -> decltype(call()) {
    try {
        return call();
    } catch (const ReportedError &error) {
        throw Error(error.code, error.what());
    } catch (const orv::Exception &error) {
        throw Error(error.Number(), error.what());
    }
}

std::vector<std::string> ListTexts(char *const *list) {
    std::vector<std::string> texts;
    for (char *const *entry = list; entry && *entry; ++entry)
        texts.emplace_back(*entry);
    return texts;
}

const DriverTable *DriverFor(FILE *handle) {
    RasterHandle *object = LookupHandle(handle);
    if (object == nullptr || object->kind != RasterHandle::Kind::DriverDataset)
        return nullptr;
    return ActiveDriver();
}

// The product description path behind a dataset name in either form.
std::string DescriptionPath(const std::string &name) {
    using namespace orv::core::fileio;
    std::unique_ptr<DataSource> source =
        DataSourceFactory::GetInstance()->Create(name);
    if (auto *uri = dynamic_cast<URI *>(source.get()))
        return File(*uri).GetNormalizedName();
    return static_cast<File &>(*source).GetNormalizedName();
}

template <typename Sample>
size_t BufferSize(int32_t width, int32_t height, size_t channels,
                  size_t samplesPerValue) {
    if (width <= 0 || height <= 0 || channels == 0)
        return 0;
    return static_cast<size_t>(width) * static_cast<size_t>(height) * channels *
           samplesPerValue;
}

bool IsDirectory(const std::string &path) {
    struct stat info {};
    return stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

bool IsRegularFile(const std::string &path) {
    struct stat info {};
    return stat(path.c_str(), &info) == 0 && S_ISREG(info.st_mode);
}

// The name with a product folder replaced by the product description inside
// it. The folder may carry a calibration choice in either form
// ("dir?c=sigma", "dir:Calibration Type:Sigma Nought"); names with a scheme
// and names that are no folder are left as they are.
std::string ProductFolderResolved(const std::string &name) {
    if (name.find("://") != std::string::npos)
        return name;
    size_t end = std::string::npos;
    if (IsDirectory(name)) {
        end = name.size();
    } else if (const size_t query = name.find('?');
               query != std::string::npos &&
               IsDirectory(name.substr(0, query))) {
        end = query;
    } else {
        const size_t slash = name.rfind('/');
        const size_t colon =
            name.find(':', slash == std::string::npos ? 0 : slash + 1);
        if (colon != std::string::npos && IsDirectory(name.substr(0, colon)))
            end = colon;
    }
    if (end == std::string::npos)
        return name;
    std::string folder = name.substr(0, end);
    std::string product = folder;
    if (product.empty() || product.back() != '/')
        product += '/';
    product += kProductDescription;
    if (!IsRegularFile(product))
        throw Error(kErrNoDataset,
                    "no " + std::string(kProductDescription) + " in " + folder);
    return product + name.substr(end);
}

// A real read gives two floats, in-phase and quadrature, for every sample
// of a complex channel, integer or float.
bool IsComplex(int32_t typeCode) {
    return typeCode == kChanComplexFloat32 || typeCode == kChanComplexInt16;
}

// Floats a real read writes: two per sample when any channel is complex, so
// that the buffer holds the read whatever the mix of channels. Zero for a
// request the host refuses, which then reports why.
size_t RealValueCount(const Raster &raster, int32_t bufferWidth,
                      int32_t bufferHeight,
                      const std::vector<int32_t> &channels) {
    bool complex = false;
    for (int32_t channel : channels)
        complex = complex || IsComplex(raster.ChannelType(channel));
    return BufferSize<float>(bufferWidth, bufferHeight, channels.size(),
                             complex ? 2 : 1);
}

// A caller's buffer must hold the whole read: the host writes all of it.
void RequireRoom(size_t needed, size_t count) {
    if (count < needed)
        throw Error(kErrBadRequest, "a read of " + std::to_string(needed) +
                                        " values into a buffer of " +
                                        std::to_string(count));
}

// The buffer of a read is allocated before the host sees the request, so
// a window outside the raster is refused here, before it costs memory.
void RequireWindowWithin(const Raster &raster, const Window &window) {
    const int32_t width = raster.Width();
    const int32_t height = raster.Height();
    if (window.x < 0 || window.y < 0 || window.width < 1 || window.height < 1 ||
        window.width > width - window.x || window.height > height - window.y)
        throw Error(kErrBadRequest,
                    raster.Name() + ": window " + std::to_string(window.x) +
                        "," + std::to_string(window.y) + " " +
                        std::to_string(window.width) + "x" +
                        std::to_string(window.height) + " is outside the " +
                        std::to_string(width) + "x" + std::to_string(height) +
                        " raster");
}

} // namespace

Error::Error(int32_t codeIn, const std::string &message)
    : std::runtime_error(message), code(codeIn) {}

Error::~Error() = default;

Raster::Raster(FILE *handleIn) : handle(handleIn) {}

Raster::~Raster() { Close(); }

Raster::Raster(Raster &&other) noexcept : handle(other.handle) {
    other.handle = nullptr;
}

Raster &Raster::operator=(Raster &&other) noexcept {
    if (this != &other) {
        Close();
        handle = other.handle;
        other.handle = nullptr;
    }
    return *this;
}

void Raster::Close() noexcept {
    if (handle == nullptr)
        return;
    try {
        VXBClose(handle);
    } catch (...) {
        // A failing close must not escape a destructor; the handle is gone
        // from the registry either way.
        UnregisterHandle(handle);
    }
    handle = nullptr;
}

std::string Raster::Name() const {
    const char *name = fp2filename(handle);
    return name ? name : "";
}

bool Raster::IsDriverDataset() const { return DriverFor(handle) != nullptr; }

int32_t Raster::Width() const {
    return Guarded([&] { return VXBChanXSize(handle); });
}

int32_t Raster::Height() const {
    return Guarded([&] { return VXBChanYSize(handle); });
}

int32_t Raster::ChannelCount() const {
    return Guarded([&] { return VXBChanCount(handle); });
}

int32_t Raster::ChannelType(int32_t channel) const {
    return Guarded([&] { return VXBChanType(handle, channel); });
}

std::vector<int32_t>
Raster::ReadInt32(const Window &window, int32_t bufferWidth,
                  int32_t bufferHeight,
                  const std::vector<int32_t> &channels) const {
    RequireWindowWithin(*this, window);
    std::vector<int32_t> buffer(
        BufferSize<int32_t>(bufferWidth, bufferHeight, channels.size(), 1));
    ReadInt32Into(window, bufferWidth, bufferHeight, channels, buffer.data(),
                  buffer.size());
    return buffer;
}

std::vector<float>
Raster::ReadReal32(const Window &window, int32_t bufferWidth,
                   int32_t bufferHeight,
                   const std::vector<int32_t> &channels) const {
    RequireWindowWithin(*this, window);
    std::vector<float> buffer(
        RealValueCount(*this, bufferWidth, bufferHeight, channels));
    ReadReal32Into(window, bufferWidth, bufferHeight, channels, buffer.data(),
                   buffer.size());
    return buffer;
}

void Raster::ReadInt32Into(const Window &window, int32_t bufferWidth,
                           int32_t bufferHeight,
                           const std::vector<int32_t> &channels, int32_t *dst,
                           size_t count) const {
    const size_t needed =
        BufferSize<int32_t>(bufferWidth, bufferHeight, channels.size(), 1);
    RequireRoom(needed, count);
    Guarded([&] {
        VXBInt32ChanIO(handle, 0, window.x, window.y, window.width,
                       window.height, needed == 0 ? nullptr : dst, bufferWidth,
                       bufferHeight, static_cast<int32_t>(channels.size()),
                       channels.data());
    });
}

void Raster::ReadReal32Into(const Window &window, int32_t bufferWidth,
                            int32_t bufferHeight,
                            const std::vector<int32_t> &channels, float *dst,
                            size_t count) const {
    const size_t needed =
        RealValueCount(*this, bufferWidth, bufferHeight, channels);
    RequireRoom(needed, count);
    Guarded([&] {
        VXBReal32ChanIO(handle, 0, window.x, window.y, window.width,
                        window.height, needed == 0 ? nullptr : dst, bufferWidth,
                        bufferHeight, static_cast<int32_t>(channels.size()),
                        channels.data());
    });
}

Entries Raster::Metadata(int32_t objectType, int32_t objectNumber) const {
    return Guarded([&] {
        ListKeeper list(
            VXBMetaDataIO(handle, 0, objectType, objectNumber, nullptr));
        return SplitEntries(list.get());
    });
}

ProjInfo_t Raster::Projection() const {
    ProjInfo_t record;
    InitProjInfo(&record, 0);
    Guarded([&] { return VXBProjectionIO(handle, 0, &record); });
    return record;
}

int32_t Raster::ProjectionCode() const {
    ProjInfo_t record = Projection();
    return DecodeGeosys(record.geosys, nullptr);
}

GcpSet Raster::GroundControlPoints() const {
    std::array<int32_t, kMaxGcpSegmentPoints> ids{};
    std::array<double, kMaxGcpSegmentPoints> pixels{}, lines{}, heights{}, xs{},
        ys{}, zs{};
    char pixelUnits[kDescriptionSize] = {}, geosys[kDescriptionSize] = {},
         elevationUnits[kDescriptionSize] = {},
         groundUnits[kDescriptionSize] = {};
    int32_t count = 0;
    Guarded([&] {
        VXBGcpIO(handle, 0, 1, 1, &count, pixelUnits, geosys, elevationUnits,
                 groundUnits, ids.data(), pixels.data(), lines.data(),
                 heights.data(), xs.data(), ys.data(), zs.data());
    });
    GcpSet set{pixelUnits, geosys, elevationUnits, groundUnits, {}};
    count =
        std::min<int32_t>(std::max<int32_t>(count, 0), kMaxGcpSegmentPoints);
    for (int32_t i = 0; i < count; ++i)
        set.points.push_back(
            {ids[i], pixels[i], lines[i], xs[i], ys[i], zs[i]});
    return set;
}

std::vector<Segment> Raster::Segments() const {
    std::vector<Segment> segments;
    const DriverTable *table = DriverFor(handle);
    if (table == nullptr || table->FindSegment == nullptr)
        return segments;
    Guarded([&] {
        for (int32_t type : kSegmentTypes) {
            int32_t number = table->FindSegment(handle, type, 0);
            if (number < 1)
                continue;
            char description[kDescriptionSize] = {};
            if (table->DescribeObject != nullptr)
                table->DescribeObject(handle, 0, type, number, description);
            segments.push_back({type, number, description});
        }
    });
    return segments;
}

std::string Raster::ObjectName() const {
    const DriverTable *table = DriverFor(handle);
    if (table == nullptr || table->DescribeObject == nullptr)
        return "";
    char text[kDescriptionSize] = {};
    Guarded([&] { table->DescribeObject(handle, 0, 1, 0, text); });
    return text;
}

std::string Raster::ChannelDescription(int32_t channel) const {
    const DriverTable *table = DriverFor(handle);
    if (table == nullptr || table->DescribeChannel == nullptr)
        return "";
    char text[kDescriptionSize] = {};
    Guarded([&] { table->DescribeChannel(handle, 0, channel, text); });
    return text;
}

std::vector<std::string> Raster::TextLines() const {
    std::vector<std::string> lines;
    const DriverTable *table = DriverFor(handle);
    if (table == nullptr || table->OpenTextSegment == nullptr ||
        table->ReadTextLine == nullptr)
        return lines;
    Guarded([&] {
        TextCursor cursor{};
        table->OpenTextSegment(handle, &cursor, "r", 0);
        std::vector<char> line(kTextLineSize);
        for (;;) {
            const int32_t lineIndex = cursor.lineIndex;
            const auto size = static_cast<int32_t>(line.size());
            if (table->ReadTextLine(&cursor, line.data(), size) != 1)
                break;
            // A line that fills the buffer may have been cut: the cursor is
            // set back to it and it is read again into twice the room.
            const bool mayBeCut =
                std::strlen(line.data()) == line.size() - 1 &&
                size <= std::numeric_limits<int32_t>::max() / 2;
            if (mayBeCut) {
                cursor.lineIndex = lineIndex;
                line.resize(line.size() * 2);
                continue;
            }
            lines.emplace_back(line.data());
            // The driver fills the whole buffer for every line.
            if (line.size() > static_cast<size_t>(kTextLineSize))
                std::vector<char>(kTextLineSize).swap(line);
        }
    });
    return lines;
}

std::vector<unsigned char> Raster::BinarySegment() const {
    return Guarded([&] {
        int32_t length = std::max<int32_t>(VXBGetBinaryLength(handle, 1), 0);
        // A dataset serves its RPC model as one whole RF block, while the
        // length it reports is that of its image file's segment; ask for a
        // whole block first and fall back to the reported length.
        if (IsDriverDataset() && length < kRFBlockSize) {
            std::vector<unsigned char> block(kRFBlockSize);
            try {
                VXBBinaryIO(handle, 0, 1, 0, kRFBlockSize, block.data());
                std::unique_ptr<RFInfo_t, decltype(&RFDeallocate)> decoded(
                    VXBBinaryToRFInfo(block.data(), kRFBlockSize),
                    &RFDeallocate);
                if (decoded)
                    return block;
            } catch (const ReportedError &) {
            }
        }
        std::vector<unsigned char> bytes(std::max(length, kRFBlockSize));
        if (length > 0)
            VXBBinaryIO(handle, 0, 1, 0, length, bytes.data());
        bytes.resize(length);
        return bytes;
    });
}

bool Raster::HasOrbit() const {
    try {
        Orbit();
        return true;
    } catch (const Error &error) {
        if (error.Code() == kErrNoOrbit)
            return false;
        throw;
    }
}

OrbitRecord Raster::Orbit() const {
    const DriverTable *table = DriverFor(handle);
    if (table == nullptr || table->ReadOrbitSegment == nullptr)
        throw Error(kErrNoOrbit, "no orbit segment in " + Name());
    EphemerisSeg_t record{};
    Guarded([&] { table->ReadOrbitSegment(handle, 0, 1, &record); });
    std::unique_ptr<StateVector_t, FreeDeleter> vectors(record.stateVectors);
    std::unique_ptr<AttitudeSample_t, FreeDeleter> attitudes(record.attitudes);
    OrbitRecord orbit;
    if (vectors)
        orbit.stateVectors.assign(vectors.get(),
                                  vectors.get() + record.stateVectorCount);
    if (attitudes)
        orbit.attitudes.assign(attitudes.get(),
                               attitudes.get() + record.attitudeCount);
    return orbit;
}

IncidenceArray Raster::Incidence() const {
    IncidenceArray incidence;
    const DriverTable *table = DriverFor(handle);
    if (table == nullptr || table->IncidenceArraySegment == nullptr)
        return incidence;
    int32_t dimensions = 0, count = 0;
    double *values = nullptr;
    char name[kDescriptionSize] = {};
    Guarded([&] {
        table->IncidenceArraySegment(handle, 0, 1, &dimensions, &count, &values,
                                     name);
    });
    std::unique_ptr<double, FreeDeleter> keeper(values);
    incidence.name = name;
    if (keeper && count > 0)
        incidence.values.assign(keeper.get(), keeper.get() + count);
    return incidence;
}

std::vector<std::string> Raster::CalibrationTypes() const {
    const DriverTable *table = DriverFor(handle);
    if (table == nullptr || table->ListCalibrationTypes == nullptr)
        return {};
    return Guarded([&] {
        ListKeeper list(
            table->ListCalibrationTypes(DescriptionPath(Name()).c_str()));
        return ListTexts(list.get());
    });
}

FileLists Raster::Files() const {
    FileLists files;
    const DriverTable *table = DriverFor(handle);
    if (table == nullptr)
        return files;
    Guarded([&] {
        if (table->ListImageFiles != nullptr) {
            ListKeeper images(table->ListImageFiles(handle));
            files.images = ListTexts(images.get());
        }
        if (table->BrowseImageFile != nullptr)
            files.browse = table->BrowseImageFile(handle);
        if (table->ListAuxiliaryFiles != nullptr) {
            ListKeeper auxiliary(table->ListAuxiliaryFiles(handle));
            files.auxiliary = ListTexts(auxiliary.get());
        }
    });
    return files;
}

Raster OpenRaster(const std::string &name) {
    ClearWarnings();
    const std::string resolved = ProductFolderResolved(name);
    FILE *handle = Guarded([&] { return VXBOpen(resolved.c_str(), "r"); });
    if (handle == nullptr) {
        std::vector<std::string> warnings = Warnings();
        throw Error(kErrNoDataset, warnings.empty() ? "cannot open " + resolved
                                                    : warnings.back());
    }
    return Raster(handle);
}

DriverInfo LoadedDriver() {
    if (ActiveDriver() == nullptr)
        throw Error(kErrNoDataset,
                    "no driver module loaded:\n" + LoadFailure());
    return DriverInfo{LoadedDriverPath(), RegisteredOperations()};
}

Entries SplitEntries(char *const *list) {
    Entries entries;
    for (char *const *entry = list; entry && *entry; ++entry) {
        const char *text = *entry;
        const char *separator = std::strstr(text, ": ");
        if (separator == nullptr)
            entries.emplace_back(text, "");
        else
            entries.emplace_back(std::string(text, separator),
                                 std::string(separator + 2));
    }
    return entries;
}

} // namespace host
