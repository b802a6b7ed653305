#include "driver/DatasetLifecycle.hpp"
#include "host/HostMemory.hpp"

#include "driver/DatasetEntry.hpp"
#include "driver/DatasetNames.hpp"
#include "driver/OpenDatasets.hpp"
#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"
#include "host/fileio/DataSourceFactory.hpp"
#include "host/fileio/URI.hpp"
#include "model/ZirOdi2CalibImage.hpp"

#include <algorithm>
#include <array>
#include <cctype>
#include <cstring>
#include <memory>
#include <string>
#include <strings.h>

using host::FreeDeleter;
using orv::core::fileio::DataSource;
using orv::core::fileio::DataSourceFactory;
using orv::core::fileio::File;
using orv::core::fileio::URI;

namespace {

constexpr int32_t kErrAccess = 43;
constexpr int32_t kDatasetHandleKind = 192;

// The product description path and calibration choice a canonical name
// designates.
struct ResolvedName {
    std::string path;
    std::string choice;
};

ResolvedName ResolveName(const std::string &canonical) {
    std::unique_ptr<DataSource> source =
        DataSourceFactory::GetInstance()->Create(canonical);
    if (auto *uri = dynamic_cast<URI *>(source.get()))
        return {File(*uri).SetExtendedInfo("")->GetNormalizedName(),
                uri->GetFirstValue("c")};
    return {
        static_cast<File &>(*source).SetExtendedInfo("")->GetNormalizedName(),
        ""};
}

std::string LowerCase(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(),
                   [](unsigned char c) { return std::tolower(c); });
    return text;
}

void RequireValidChoice(const std::string &choice) {
    static const std::array<const char *, 5> kAccepted = {"", "beta", "gamma",
                                                          "none", "sigma"};
    for (const char *accepted : kAccepted)
        if (choice == accepted)
            return;
    throw orv::Exception("Calibration \"" + choice +
                             "\" is invalid for a RADARSAT2 file",
                         "", "", 0);
}

int32_t DeclaredChannelType(ZirOdi2CalibImage &model) {
    const char *calibration = model.GetCalibrationType();
    bool uncalibrated =
        calibration != nullptr && std::strstr(calibration, "None") != nullptr;
    bool complex =
        model.GetProductType() == static_cast<int32_t>(ProductType::SLC);
    if (uncalibrated)
        return complex ? kChanComplexInt16 : kChanInt32;
    return complex ? kChanComplexFloat32 : kChanFloat32;
}

// The host builds the orbit from the metadata and projection it gets back
// through this driver's own table; a product without a usable orbit opens
// all the same.
void AttachOrbit(FILE *handle, ZirOdi2CalibImage &model) {
    host::HostList list(VXBMetaDataIO(handle, 0, 1, 0, nullptr));
    ProjInfo_t projection;
    InitProjInfo(&projection, 0);
    try {
        VXBProjectionIO(handle, 0, &projection);
        model.SetOrbit(GetOrbitPtr(list.get(), &projection));
    } catch (const orv::DataException &) {
    }
}

} // namespace

FILE *OpenDataset(const char *name, const char *access) {
    if (access == nullptr || strcasecmp(access, "r") != 0) {
        IMPErrChar(kErrAccess, 0, "access", access);
        return nullptr;
    }
    // The canonical name becomes the handle's host name.
    std::unique_ptr<char, FreeDeleter> canonical(NormalizeDatasetName(name));
    ResolvedName resolved = ResolveName(canonical.get());
    std::string choice = LowerCase(resolved.choice);
    RequireValidChoice(choice);

    auto entry = std::make_unique<DatasetEntry>();
    if (!entry->Load(resolved.path.c_str(), choice.c_str()))
        return nullptr;
    FILE *handle = fpAlloc(canonical.get(), kDatasetHandleKind, nullptr);
    if (handle == nullptr)
        return nullptr;
    ZirOdi2CalibImage &model = *entry->Model();
    OpenDatasets()[handle] = entry.release();
    try {
        // Calibration, product type and channel count first: the count is
        // the request that builds the channel table.
        int32_t typeCode = DeclaredChannelType(model);
        int32_t channels = model.ChannelCount();
        int32_t height = model.Height();
        int32_t width = model.Width();
        RawDefine(handle, width, height, channels, typeCode, 0, 0);
        AttachOrbit(handle, model);
    } catch (...) {
        // A report during set-up must not leave a half-open dataset behind.
        CloseDataset(handle);
        throw;
    }
    return handle;
}

void CloseDataset(FILE *handle) {
    auto &datasets = OpenDatasets();
    auto found = datasets.find(handle);
    if (found == datasets.end())
        return;
    delete found->second;
    datasets.erase(found);
    RawClose(handle);
    fpDealloc(handle);
}
