#pragma once

#include "host/Visibility.hpp"

#include "host/Ephemeris.hpp"
#include "host/ModelSegments.hpp"
#include "host/ProjectionServices.hpp"

#include <cstdint>
#include <cstdio>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

// The application API of the host: what programs use to open a raster by
// name and ask it for pixels, metadata and segments. Every host error report
// and every exception a driver raises for the user becomes a host::Error.
//
// Pixel convention (pixel is area): raster position (column, line) = (0, 0)
// is the upper-left CORNER of the first pixel, and the centre of pixel
// (c, l) lies at (c + 0.5, l + 0.5). Projection() transforms such positions
// (its transform applied to (0, 0) gives the image's outer corner), and the
// pixel and line of GroundControlPoints() are such positions too: a point at
// the centre of the first pixel has pixel 0.5, line 0.5. GeoTIFF files
// written as pixel-is-point are shifted by half a pixel on reading.

namespace host {

class VXB_API Error : public std::runtime_error {
  public:
    Error(int32_t codeIn, const std::string &message);
    ~Error() override;
    int32_t Code() const { return code; }

  private:
    int32_t code;
};

struct Window {
    int32_t x = 0, y = 0;          // first column and line
    int32_t width = 0, height = 0; // in image pixels
};

using Entries = std::vector<std::pair<std::string, std::string>>;

struct GroundControlPoint {
    int32_t id;
    double pixel, line; // pixel-is-area raster position (see above)
    double x, y, z;
};

struct GcpSet {
    std::string pixelUnits;   // "PIXEL"
    std::string groundGeosys; // coordinate system of x, y
    std::string elevationUnits;
    std::string groundUnits;
    std::vector<GroundControlPoint> points;
};

struct Segment {
    int32_t type;
    int32_t number;
    std::string description;
};

struct IncidenceArray {
    std::string name;
    std::vector<double> values; // degrees, one per column
};

struct FileLists {
    std::vector<std::string> images;
    std::string browse;
    std::vector<std::string> auxiliary;
};

struct OrbitRecord {
    std::vector<StateVector_t> stateVectors;
    std::vector<AttitudeSample_t> attitudes;
};

/// The segment types a dataset may offer, in the order they are listed.
constexpr int32_t kSegmentTypes[] = {140, 160, 180, 181, 214};

/// An open raster; closes itself when destroyed. Move-only.
class VXB_API Raster {
  public:
    explicit Raster(FILE *handleIn);
    ~Raster();
    Raster(Raster &&other) noexcept;
    Raster &operator=(Raster &&other) noexcept;
    Raster(const Raster &) = delete;
    Raster &operator=(const Raster &) = delete;

    FILE *Handle() const { return handle; }
    /// The handle's name (the canonical dataset name for driver datasets).
    std::string Name() const;
    bool IsDriverDataset() const;
    int32_t Width() const;
    int32_t Height() const;
    int32_t ChannelCount() const;
    int32_t ChannelType(int32_t channel) const;

    /// A window resampled to bufferWidth x bufferHeight, pixel-interleaved
    /// over channels (1-based); complex real data gives two floats per sample.
    /// A window outside the raster throws Error before any allocation.
    std::vector<int32_t> ReadInt32(const Window &window, int32_t bufferWidth,
                                   int32_t bufferHeight,
                                   const std::vector<int32_t> &channels) const;
    std::vector<float> ReadReal32(const Window &window, int32_t bufferWidth,
                                  int32_t bufferHeight,
                                  const std::vector<int32_t> &channels) const;
    /// The same reads into the caller's dst of count values, for programs
    /// that read band after band into one buffer. Throws Error when count
    /// is below what the read writes.
    void ReadInt32Into(const Window &window, int32_t bufferWidth,
                       int32_t bufferHeight,
                       const std::vector<int32_t> &channels, int32_t *dst,
                       size_t count) const;
    void ReadReal32Into(const Window &window, int32_t bufferWidth,
                        int32_t bufferHeight,
                        const std::vector<int32_t> &channels, float *dst,
                        size_t count) const;

    /// The metadata of object type 1 (the dataset) or 2 (channel number),
    /// or another object type the dataset answers for (181).
    Entries Metadata(int32_t objectType, int32_t objectNumber = 0) const;
    ProjInfo_t Projection() const;
    int32_t ProjectionCode() const;
    GcpSet GroundControlPoints() const;

    /// Driver datasets only (empty answers for a plain image):
    std::vector<Segment> Segments() const;
    std::string ObjectName() const;
    std::string ChannelDescription(int32_t channel) const;
    std::vector<std::string> TextLines() const;
    std::vector<unsigned char> BinarySegment() const;
    bool HasOrbit() const;
    OrbitRecord Orbit() const;
    IncidenceArray Incidence() const;
    std::vector<std::string> CalibrationTypes() const;
    FileLists Files() const;

  private:
    void Close() noexcept;
    FILE *handle;
};

/// Opens a raster by name: a GeoTIFF file, or any name the driver accepts.
/// A product folder stands for the product.xml inside it, also with a
/// calibration choice ("dir?c=sigma", "dir:Calibration Type:Sigma Nought");
/// a folder without one throws Error "no product.xml in <folder>".
Raster OpenRaster(const std::string &name);

/// The driver the host loaded: module path and registered operations.
struct DriverInfo {
    std::string path;
    std::vector<std::pair<std::string, size_t>> operations; // name, offset
};
DriverInfo LoadedDriver();

/// Entries "KEY: VALUE" split into pairs (an entry without ": " keeps its
/// text as the key).
Entries SplitEntries(char *const *list);

} // namespace host
