#pragma once

#include <tiffio.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace host {

/// Error codes of the built-in GeoTIFF reader.
constexpr int32_t kErrUnreadableFile = 3; // not a TIFF it decodes, or damaged
constexpr int32_t kErrBadRequest = 5;     // window, size or channel refused

/// TIFF tag of the RPC model (92 doubles, see TiffGeoreferencing.cpp).
constexpr ttag_t kRpcCoefficientTag = 50844;

/// A read-only descriptor of the file at path, which the caller closes, or
/// -1 when it cannot be opened or is no regular file (errno is then EINVAL).
/// The open never waits: a pipe or a device named like an image is refused
/// at once instead of blocking until some writer appears.
int OpenRegularFile(const std::string &path);

/// The one owner of a libtiff handle. The file is opened read-only and read
/// with read(), never memory-mapped: a mapped file truncated by another
/// process while it is open would end this one with SIGBUS, while a short
/// read is an ordinary decoding failure. libtiff's errors go to this object,
/// never to stderr, and the latest one becomes the reason of the next
/// reported failure. libtiff's warnings are dropped: they never stop a read.
class TiffFile {
  public:
    /// Opens pathIn; throws host::ReportedError naming the file and libtiff's
    /// reason when it is not a TIFF libtiff can read.
    explicit TiffFile(const std::string &pathIn);
    ~TiffFile();
    TiffFile(const TiffFile &) = delete;
    TiffFile &operator=(const TiffFile &) = delete;

    TIFF *Handle() const { return tiff.get(); }
    const std::string &Path() const { return path; }
    /// Size of the file in bytes.
    uint64_t FileSize() const;

    /// Throws host::ReportedError(kErrUnreadableFile) with "path: what",
    /// followed by libtiff's latest message when it left one.
    [[noreturn]] void Fail(const std::string &what) const;

    /// A one-value tag, or libtiff's default for it, or fallback.
    uint16_t UInt16Field(ttag_t tag, uint16_t fallback) const;
    uint32_t UInt32Field(ttag_t tag, uint32_t fallback) const;
    /// The values of a variable-length double tag; empty when absent.
    std::vector<double> DoubleArrayField(ttag_t tag) const;

  private:
    struct Closer {
        void operator()(TIFF *handle) const { TIFFClose(handle); }
    };

    std::string path;
    // The open file, at a fixed address for libtiff's callbacks; declared
    // before tiff so that it outlives the handle, and closed after it.
    std::unique_ptr<int> descriptor;
    // libtiff's latest error on this handle; it lives at a fixed address,
    // declared before tiff so that it outlives the handle pointing to it.
    std::unique_ptr<std::string> lastError;
    std::unique_ptr<TIFF, Closer> tiff;
};

} // namespace host
