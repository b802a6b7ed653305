#include "host/TiffFile.hpp"

#include "host/ErrorReports.hpp"

#include <xtiffio.h>

#include <cerrno>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <fcntl.h>
#include <mutex>
#include <sys/stat.h>
#include <unistd.h>

namespace host {
namespace {

struct OptionsDeleter {
    void operator()(TIFFOpenOptions *options) const {
        TIFFOpenOptionsFree(options);
    }
};

std::string FormatMessage(const char *module, const char *format,
                          va_list args) {
    char text[1024];
    std::vsnprintf(text, sizeof text, format, args);
    if (module == nullptr || *module == '\0')
        return text;
    return std::string(module) + ": " + text;
}

int KeepError(TIFF *, void *lastError, const char *module, const char *format,
              va_list args) {
    *static_cast<std::string *>(lastError) =
        FormatMessage(module, format, args);
    return 1;
}

int DropWarning(TIFF *, void *, const char *, const char *, va_list) {
    return 1;
}

TIFFExtendProc previousExtender = nullptr;

// The RPC tag is no tag libtiff knows; without a definition it would be read
// as an anonymous field whose count type depends on the libtiff version.
void DefinePrivateTags(TIFF *tif) {
    static char rpcName[] = "RPCCoefficient";
    static const TIFFFieldInfo fields[] = {
        {kRpcCoefficientTag, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_DOUBLE,
         FIELD_CUSTOM, 1, 1, rpcName},
    };
    TIFFMergeFieldInfo(tif, fields, 1);
    if (previousExtender != nullptr)
        previousExtender(tif);
}

// libtiff's tag extenders are process-wide: the GeoTIFF tag definitions and
// ours are chained once, in front of whatever extender was there before.
void InstallTagDefinitions() {
    static std::once_flag once;
    std::call_once(once, [] {
        XTIFFInitialize();
        previousExtender = TIFFSetTagExtender(DefinePrivateTags);
    });
}

// libtiff reads through these procedures; the client data is the file's
// descriptor.
int DescriptorOf(thandle_t client) { return *static_cast<int *>(client); }

tmsize_t ReadProc(thandle_t client, void *buffer, tmsize_t size) {
    tmsize_t done = 0;
    while (done < size) {
        ssize_t got =
            read(DescriptorOf(client), static_cast<char *>(buffer) + done,
                 static_cast<size_t>(size - done));
        if (got < 0 && errno == EINTR)
            continue;
        if (got <= 0)
            break;
        done += got;
    }
    return done;
}

tmsize_t WriteProc(thandle_t, void *, tmsize_t) { return -1; }

toff_t SeekProc(thandle_t client, toff_t offset, int whence) {
    off_t moved =
        lseek(DescriptorOf(client), static_cast<off_t>(offset), whence);
    return moved < 0 ? static_cast<toff_t>(-1) : static_cast<toff_t>(moved);
}

int CloseProc(thandle_t) { return 0; } // the descriptor is closed by ~TiffFile

toff_t SizeProc(thandle_t client) {
    struct stat info {};
    if (fstat(DescriptorOf(client), &info) != 0)
        return 0;
    return static_cast<toff_t>(info.st_size);
}

int NoMapProc(thandle_t, void **, toff_t *) { return 0; }

void NoUnmapProc(thandle_t, void *, toff_t) {}

} // namespace

int OpenRegularFile(const std::string &path) {
    const int descriptor =
        open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
    if (descriptor < 0)
        return -1;
    struct stat info {};
    if (fstat(descriptor, &info) != 0 || !S_ISREG(info.st_mode)) {
        close(descriptor);
        errno = EINVAL;
        return -1;
    }
    return descriptor;
}

TiffFile::TiffFile(const std::string &pathIn)
    : path(pathIn), lastError(std::make_unique<std::string>()) {
    InstallTagDefinitions();
    std::unique_ptr<TIFFOpenOptions, OptionsDeleter> options(
        TIFFOpenOptionsAlloc());
    if (!options)
        Fail("cannot allocate libtiff options");
    TIFFOpenOptionsSetErrorHandlerExtR(options.get(), KeepError,
                                       lastError.get());
    TIFFOpenOptionsSetWarningHandlerExtR(options.get(), DropWarning, nullptr);
    descriptor = std::make_unique<int>(OpenRegularFile(path));
    if (*descriptor < 0)
        Fail(errno == EINVAL ? "not a regular file" : "cannot open the file");
    // "m": never map the file (see the class comment).
    tiff.reset(TIFFClientOpenExt(path.c_str(), "rm", descriptor.get(), ReadProc,
                                 WriteProc, SeekProc, CloseProc, SizeProc,
                                 NoMapProc, NoUnmapProc, options.get()));
    if (!tiff) {
        close(*descriptor);
        Fail("not a readable TIFF file");
    }
    lastError->clear();
}

TiffFile::~TiffFile() {
    tiff.reset();
    if (descriptor && *descriptor >= 0)
        close(*descriptor);
}

uint64_t TiffFile::FileSize() const {
    struct stat info {};
    if (fstat(*descriptor, &info) != 0)
        Fail("cannot read the file size");
    return static_cast<uint64_t>(info.st_size);
}

void TiffFile::Fail(const std::string &what) const {
    std::string message = path + ": " + what;
    if (!lastError->empty())
        message += " (" + *lastError + ")";
    lastError->clear();
    throw ReportedError(kErrUnreadableFile, kError, message);
}

uint16_t TiffFile::UInt16Field(ttag_t tag, uint16_t fallback) const {
    uint16_t value = 0;
    return TIFFGetFieldDefaulted(tiff.get(), tag, &value) == 1 ? value
                                                               : fallback;
}

uint32_t TiffFile::UInt32Field(ttag_t tag, uint32_t fallback) const {
    uint32_t value = 0;
    return TIFFGetFieldDefaulted(tiff.get(), tag, &value) == 1 ? value
                                                               : fallback;
}

std::vector<double> TiffFile::DoubleArrayField(ttag_t tag) const {
    const TIFFField *field = TIFFFieldWithTag(tiff.get(), tag);
    if (field == nullptr || TIFFFieldDataType(field) != TIFF_DOUBLE ||
        !TIFFFieldPassCount(field))
        return {};
    const double *values = nullptr;
    uint32_t count = 0;
    if (TIFFFieldSetGetCountSize(field) == 2) {
        uint16_t shortCount = 0;
        if (TIFFGetField(tiff.get(), tag, &shortCount, &values) != 1)
            return {};
        count = shortCount;
    } else if (TIFFGetField(tiff.get(), tag, &count, &values) != 1) {
        return {};
    }
    if (values == nullptr)
        return {};
    return std::vector<double>(values, values + count);
}

} // namespace host
