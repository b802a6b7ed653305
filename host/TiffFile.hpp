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

/// The one owner of a libtiff handle. The file is opened read-only and
/// memory-mapped by this class: uncompressed strips are then copied straight
/// from the page cache, which halves the time of a full read compared with a
/// read() per strip. Pages behind the read are released from the mapping
/// (ReleaseBlock), so resident memory stays bounded by a window of the file,
/// not by the file. The price of mapping: a file truncated
/// by another process while it is open ends this one with SIGBUS (a file
/// truncated before it is opened is refused, see
/// TiffBlockCache::CheckStoredInFile). libtiff's errors go to
/// this object, never to stderr, and the latest one becomes the reason of
/// the next reported failure. libtiff's warnings are dropped: they never
/// stop a read.
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
    /// Tells the file that block index has been decoded: mapped pages well
    /// before it are dropped from this process's resident memory (they stay
    /// in the page cache and are mapped in again when read again), so a read
    /// through the file keeps a bounded window of it resident.
    void ReleaseBlock(uint32_t index) const;

    /// Throws host::ReportedError(kErrUnreadableFile) with "path: what",
    /// followed by libtiff's latest message when it left one.
    [[noreturn]] void Fail(const std::string &what) const;

    /// A one-value tag, or libtiff's default for it, or fallback.
    uint16_t UInt16Field(ttag_t tag, uint16_t fallback) const;
    uint32_t UInt32Field(ttag_t tag, uint32_t fallback) const;
    /// The values of a variable-length double tag; empty when absent.
    std::vector<double> DoubleArrayField(ttag_t tag) const;

    /// The open file and its mapping, handed to libtiff as client data.
    struct Mapping {
        int descriptor = -1;
        void *base = nullptr;      // null until libtiff asks for the mapping
        uint64_t size = 0;         // bytes mapped
        uint64_t releasedUpTo = 0; // bytes before this were released
    };

  private:
    struct Closer {
        void operator()(TIFF *handle) const { TIFFClose(handle); }
    };

    std::string path;
    // Lives at a fixed address for libtiff's callbacks; declared before tiff
    // so that it outlives the handle, and closed after it.
    std::unique_ptr<Mapping> mapping;
    // libtiff's latest error on this handle; it lives at a fixed address,
    // declared before tiff so that it outlives the handle pointing to it.
    std::unique_ptr<std::string> lastError;
    std::unique_ptr<TIFF, Closer> tiff;
};

} // namespace host
