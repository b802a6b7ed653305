#include "host/DriverRegistry.hpp"

#include <cstdlib>
#include <cstring>
#include <dlfcn.h>
#include <sys/stat.h>

namespace host {
namespace {

struct LoadedDriver {
    bool attempted = false;
    DriverTable table{};
    bool loaded = false;
    std::string path;
    std::string failure;
};

LoadedDriver &Driver() {
    static LoadedDriver driver;
    return driver;
}

bool IsDirectory(const std::string &path) {
    struct stat info {};
    return stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

std::string FolderOfThisLibrary() {
    Dl_info info{};
    if (dladdr(reinterpret_cast<void *>(&ActiveDriver), &info) == 0 ||
        info.dli_fname == nullptr)
        return "";
    std::string path = info.dli_fname;
    size_t slash = path.rfind('/');
    return slash == std::string::npos ? "" : path.substr(0, slash + 1);
}

std::vector<std::string> CandidatePaths() {
    std::vector<std::string> candidates;
    if (const char *configured = std::getenv("VXB_DRIVER_PATH");
        configured != nullptr && *configured != '\0') {
        std::string path = configured;
        candidates.push_back(IsDirectory(path) ? path + "/" + kDriverModuleName
                                               : path);
    }
    std::string here = FolderOfThisLibrary();
    if (!here.empty())
        candidates.push_back(here + kDriverModuleName);
    candidates.push_back(std::string(VXB_INSTALL_LIBDIR) + "/" +
                         kDriverModuleName);
    return candidates;
}

// Loads one module and lets it fill a zeroed table. The module stays loaded
// for the life of the process: its open datasets live in its static state.
bool TryLoad(const std::string &path, LoadedDriver &driver) {
    void *module = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (module == nullptr) {
        const char *reason = dlerror();
        driver.failure +=
            path + ": " + (reason ? reason : "cannot load") + "\n";
        return false;
    }
    auto registrar = reinterpret_cast<DriverRegistrarFn>(
        dlsym(module, kDriverRegistrarName));
    if (registrar == nullptr) {
        driver.failure += path + ": no " + kDriverRegistrarName + "\n";
        dlclose(module);
        return false;
    }
    registrar(&driver.table);
    driver.path = path;
    driver.failure.clear();
    return true;
}

} // namespace

const DriverTable *ActiveDriver() {
    LoadedDriver &driver = Driver();
    if (!driver.attempted) {
        driver.attempted = true;
        for (const std::string &path : CandidatePaths())
            if ((driver.loaded = TryLoad(path, driver)))
                break;
    }
    return driver.loaded ? &driver.table : nullptr;
}

const std::string &LoadFailure() { return Driver().failure; }

const std::string &LoadedDriverPath() { return Driver().path; }

std::vector<std::pair<std::string, size_t>> RegisteredOperations() {
    static const std::pair<const char *, size_t> kSlots[] = {
        {"RawSizeInfo", offsetof(DriverTable, RawSizeInfo)},
        {"RawChanType", offsetof(DriverTable, RawChanType)},
        {"IntegerChannelRead", offsetof(DriverTable, IntegerChannelRead)},
        {"RealChannelRead", offsetof(DriverTable, RealChannelRead)},
        {"DescribeChannel", offsetof(DriverTable, DescribeChannel)},
        {"CloseDataset", offsetof(DriverTable, CloseDataset)},
        {"OpenDataset", offsetof(DriverTable, OpenDataset)},
        {"DescribeObject", offsetof(DriverTable, DescribeObject)},
        {"FindSegment", offsetof(DriverTable, FindSegment)},
        {"OpenTextSegment", offsetof(DriverTable, OpenTextSegment)},
        {"ReadTextLine", offsetof(DriverTable, ReadTextLine)},
        {"ReadProjection", offsetof(DriverTable, ReadProjection)},
        {"ReadGcpSegment", offsetof(DriverTable, ReadGcpSegment)},
        {"ReadMetadata", offsetof(DriverTable, ReadMetadata)},
        {"ReadOrbitSegment", offsetof(DriverTable, ReadOrbitSegment)},
        {"ReadBinarySegment", offsetof(DriverTable, ReadBinarySegment)},
        {"BinarySegmentLength", offsetof(DriverTable, BinarySegmentLength)},
        {"IncidenceArraySegment", offsetof(DriverTable, IncidenceArraySegment)},
        {"ListCalibrationTypes", offsetof(DriverTable, ListCalibrationTypes)},
        {"NormalizeDatasetName", offsetof(DriverTable, NormalizeDatasetName)},
        {"ListImageFiles", offsetof(DriverTable, ListImageFiles)},
        {"BrowseImageFile", offsetof(DriverTable, BrowseImageFile)},
        {"ListAuxiliaryFiles", offsetof(DriverTable, ListAuxiliaryFiles)},
    };
    std::vector<std::pair<std::string, size_t>> registered;
    const DriverTable *table = ActiveDriver();
    if (table == nullptr)
        return registered;
    const auto *bytes = reinterpret_cast<const unsigned char *>(table);
    for (const auto &[name, offset] : kSlots) {
        void *entry = nullptr;
        std::memcpy(&entry, bytes + offset, sizeof entry);
        if (entry != nullptr)
            registered.emplace_back(name, offset);
    }
    return registered;
}

} // namespace host
