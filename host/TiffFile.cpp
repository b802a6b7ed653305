#include "host/TiffFile.hpp"

#include "host/ErrorReports.hpp"

#include <xtiffio.h>

#include <cstdarg>
#include <cstdio>
#include <mutex>
#include <sys/stat.h>

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

} // namespace

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
    tiff.reset(TIFFOpenExt(path.c_str(), "r", options.get()));
    if (!tiff)
        Fail("not a readable TIFF file");
    lastError->clear();
}

TiffFile::~TiffFile() = default;

uint64_t TiffFile::FileSize() const {
    struct stat info {};
    if (fstat(TIFFFileno(tiff.get()), &info) != 0)
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
