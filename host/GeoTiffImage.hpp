#pragma once

#include "host/ProjectionServices.hpp"

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace host {

/// A window of an image in pixels, and the grid it is resampled to.
struct WindowRequest {
    int32_t xoff, yoff;   // first column and line
    int32_t xsize, ysize; // window size in image pixels
    int32_t dstx, dsty;   // output grid size
};

/// One ground control point of a GeoTIFF (ModelTiepointTag).
struct TiePoint {
    double pixel, line; // raster position
    double x, y,
        z; // model position (longitude, latitude, height for geographic files)
};

/// How a file stores its samples, as it declares them.
struct StoredSamples {
    int32_t sampleFormat;    // TIFF SampleFormat (a void format reads as 1)
    int32_t bitsPerSample;   // a complex sample counts both halves
    int32_t samplesPerPixel; // a complex sample counts once
};

/// A GeoTIFF file opened for reading by the built-in reader. It owns its
/// TIFF handle; libtiff's messages go to a per-image handler and are kept as
/// the reason of the next failure, never printed.
class GeoTiffImage {
  public:
    /// Opens path; throws host::ReportedError (naming the file and the
    /// reason) when it is not a TIFF this reader decodes.
    static std::unique_ptr<GeoTiffImage> Open(const std::string &path);
    ~GeoTiffImage();
    GeoTiffImage(const GeoTiffImage &) = delete;
    GeoTiffImage &operator=(const GeoTiffImage &) = delete;

    const std::string &Path() const;
    int32_t Width() const;
    int32_t Height() const;
    /// Samples per pixel; a complex-integer sample counts as two channels.
    int32_t ChannelCount() const;
    /// ChannelTypeCode of the channels (all channels share one type).
    int32_t ChannelType() const;
    StoredSamples Samples() const;

    /// Throws host::ReportedError when window is empty or reaches outside
    /// the image: the check of a read that comes before anything is
    /// allocated for it.
    void CheckWindow(const WindowRequest &window) const;
    /// Reads a window resampled by nearest neighbour into dst,
    /// pixel-interleaved over channels (1-based). Throws host::ReportedError
    /// for a bad window, size or channel, and for a decoding failure; nothing
    /// is written to dst then.
    void ReadInt32(const WindowRequest &window,
                   const std::vector<int32_t> &channels, int32_t *dst);
    void ReadReal32(const WindowRequest &window,
                    const std::vector<int32_t> &channels, float *dst);

    /// The coordinate system and affine transform of the file; "PIXEL" with
    /// an identity transform when it carries no georeferencing.
    ProjInfo_t Projection() const;
    /// The model coordinate system of the tie points ("LONG D000" for
    /// geographic files, a UTM text for projected ones, "PIXEL" when unknown).
    std::string TiePointGeosys() const;
    const std::vector<TiePoint> &TiePoints() const;
    /// The RPC model of the file as an RF block, empty when it has none.
    const std::vector<unsigned char> &RpcBlock() const;

  private:
    struct State;
    explicit GeoTiffImage(std::unique_ptr<State> stateIn);
    std::unique_ptr<State> state;
};

/// True when path is a regular file that starts with a TIFF or BigTIFF
/// signature; anything else is answered without waiting on it.
bool HasTiffSignature(const std::string &path);

} // namespace host
