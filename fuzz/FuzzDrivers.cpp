#include "fuzz/FuzzDrivers.hpp"

#include "driver/DatasetNames.hpp"
#include "fuzz/FolderArchive.hpp"
#include "fuzz/FuzzWorkspace.hpp"
#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/GeoTiffImage.hpp"
#include "host/HostMemory.hpp"
#include "host/Raster.hpp"
#include "host/TextServices.hpp"
#include "model/ZirOdi2CalibImage.hpp"
#include "product/CalibrationTables.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "product/SideFile.hpp"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <vector>

namespace rs2fuzz {
namespace {

// The longest dataset name tried: longer ones only repeat what shorter ones
// reach, and the host ends names at the first NUL anyway.
constexpr size_t kMaxNameLength = 4096;
// The most channels and the widest output grid a read asks for: enough to
// cross strips, tiles and planes, small enough that the buffers stay small
// whatever size the input declares.
constexpr int32_t kMaxChannels = 4;
constexpr int32_t kMaxGrid = 16;

// Runs one step, turning the errors the code under test reports into an
// outcome; any other exception is left to end the run as a finding.
template <typename Step> Outcome Attempt(Step step) {
    try {
        step();
        return {true, ""};
    } catch (const host::Error &error) {
        return {false, error.what()};
    } catch (const host::ReportedError &error) {
        return {false, error.what()};
    } catch (const orv::Exception &error) {
        return {false, error.what()};
    }
}

// The outcome of two steps run one after the other: the first error counts.
Outcome Both(const Outcome &first, const Outcome &second) {
    return first.accepted ? second : first;
}

// A window of at most kMaxGrid x kMaxGrid pixels at the far corner of a
// width x height image, or at its origin.
host::Window CornerWindow(int32_t width, int32_t height, bool farCorner) {
    host::Window window;
    window.width = std::min(width, kMaxGrid);
    window.height = std::min(height, kMaxGrid);
    window.x = farCorner ? width - window.width : 0;
    window.y = farCorner ? height - window.height : 0;
    return window;
}

std::vector<int32_t> FirstChannels(int32_t count) {
    std::vector<int32_t> channels;
    for (int32_t c = 1; c <= std::min(count, kMaxChannels); ++c)
        channels.push_back(c);
    return channels;
}

// Reads the whole image decimated to a small grid and both corners at full
// resolution, as integers and as reals, from the first channels.
void ReadWindows(const host::Raster &raster) {
    const int32_t width = raster.Width();
    const int32_t height = raster.Height();
    const std::vector<int32_t> channels = FirstChannels(raster.ChannelCount());
    const host::Window whole{0, 0, width, height};
    const int32_t gridWidth = std::min(width, kMaxGrid);
    const int32_t gridHeight = std::min(height, kMaxGrid);
    raster.ReadReal32(whole, gridWidth, gridHeight, channels);
    raster.ReadInt32(whole, gridWidth, gridHeight, {1});
    for (bool farCorner : {false, true}) {
        const host::Window corner = CornerWindow(width, height, farCorner);
        raster.ReadInt32(corner, corner.width, corner.height, channels);
        raster.ReadReal32(corner, corner.width, corner.height, {1});
    }
}

// Reads windows of an open raster and asks it everything a program
// describing it asks. Whether the raster served its pixels is the outcome;
// the other questions may each be refused with a reported error (a plain
// image has no orbit, say), which is as defined an answer as any.
Outcome Describe(const host::Raster &raster) {
    const Outcome read = Attempt([&] { ReadWindows(raster); });
    Attempt([&] { raster.Metadata(1); });
    Attempt([&] { raster.Metadata(2, 1); });
    Attempt([&] { raster.Projection(); });
    Attempt([&] { raster.GroundControlPoints(); });
    Attempt([&] { raster.Segments(); });
    Attempt([&] { raster.ObjectName(); });
    Attempt([&] { raster.ChannelDescription(1); });
    Attempt([&] { raster.BinarySegment(); });
    Attempt([&] { raster.Orbit(); });
    Attempt([&] { raster.Incidence(); });
    Attempt([&] { raster.CalibrationTypes(); });
    Attempt([&] { raster.Files(); });
    return read;
}

Outcome OpenAndDescribe(const std::string &name) {
    Outcome described;
    Outcome opened =
        Attempt([&] { described = Describe(host::OpenRaster(name)); });
    return Both(opened, described);
}

// Reads every pixel of the model's first channel (at most a small grid).
void ReadFirstChannel(ZirOdi2CalibImage &model) {
    const int32_t width = std::min(model.Width(), kMaxGrid);
    const int32_t height = std::min(model.Height(), kMaxGrid);
    if (width < 1 || height < 1)
        return;
    // Two floats per pixel hold a complex channel too.
    std::vector<float> pixels(static_cast<size_t>(width) * height * 2);
    const int32_t channel = 1;
    model.ReadRealChannels(0, 0, 0, width, height, pixels.data(), width, height,
                           1, &channel);
}

// Loads the product at path as the open operation does, with a calibration,
// and reads its first channel through the model.
Outcome LoadAndRead(const std::string &path, const char *calibration) {
    ProductReader reader;
    return Attempt([&] {
        std::unique_ptr<ZirOdi2CalibImage> model(
            LoadProduct(reader, path.c_str(), calibration));
        if (!model)
            throw orv::Exception("no model", "", "", 0);
        ReadFirstChannel(*model);
    });
}

// The workspace product of the lut target, parsed and loaded once: only the
// table file changes from input to input, so only the calibration is loaded
// again for each.
struct CalibrationBench {
    explicit CalibrationBench(const Workspace &workspace)
        : description(workspace.ProductXml().c_str()),
          model(LoadProduct(reader, workspace.ProductXml().c_str(), "none")) {
        if (description.Document() == nullptr || !model)
            throw std::runtime_error("the workspace product does not load");
        // Opens the model's images now, so that the host's handle registry
        // is made before this object and still exists when the model closes
        // them at exit.
        ReadFirstChannel(*model);
    }

    // Loads the calibration and incidence angles from the table files as
    // loading the product would, starting from a model without them.
    void Load() {
        model->SetCalibrationType("None");
        model->CalibrationTable() = ::LookupTable();
        model->IncidenceTable() = ::LookupTable();
        LookupTableFiles files;
        LoadCalibration(description.Document(), model.get(), "sigma", files);
        ReadIncidenceAngles(description.Document(), model.get(),
                            IncidenceFormula::Detected, files);
    }

    DocumentParse description;
    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model;
};

// The workspace for a product description: one with complex images for a
// description that declares a single-look complex product, one with
// detected images for any other, so that both kinds get as far as their
// pixels.
const Workspace &WorkspaceFor(const char *target, const uint8_t *data,
                              size_t size) {
    static const std::string kComplex = "<productType>SLC<";
    const auto *text = reinterpret_cast<const char *>(data);
    const bool complex = std::search(text, text + size, kComplex.begin(),
                                     kComplex.end()) != text + size;
    return Workspace::Of(target, complex ? "SLC" : "SGF");
}

// Every target starts from an empty warning log: the log is the process's,
// and reports of earlier inputs would pile up in it.
Outcome ProductXml(const uint8_t *data, size_t size) {
    host::ClearWarnings();
    const Workspace &workspace = WorkspaceFor("product_xml", data, size);
    workspace.Write("product.xml", data, size);
    return Both(LoadAndRead(workspace.ProductXml(), "sigma"),
                OpenAndDescribe(workspace.ProductXml()));
}

Outcome LookupTableFile(const uint8_t *data, size_t size) {
    host::ClearWarnings();
    const Workspace &workspace = Workspace::Of("lut");
    static CalibrationBench bench(workspace);
    workspace.Write("lutSigma.xml", data, size);
    return Attempt([&] {
        bench.Load();
        ReadFirstChannel(*bench.model);
    });
}

Outcome SideFile(const uint8_t *data, size_t size) {
    host::ClearWarnings();
    const Workspace &workspace = Workspace::Of("side_file");
    workspace.Write("ProductDescription.self", data, size);
    ProductReader reader;
    reader.productPath = HString(workspace.ProductXml().c_str());
    host::HostList entries(ReadSideFile(reader));
    return {entries != nullptr, entries ? "" : "no entries"};
}

// Whether path lies in the workspace folder; only such names are opened.
bool InsideWorkspace(const std::string &path, const Workspace &workspace) {
    const std::string normal =
        std::filesystem::path(path).lexically_normal().string();
    const std::string &folder = workspace.Folder();
    return normal.compare(0, folder.size(), folder) == 0 &&
           (normal.size() == folder.size() || normal[folder.size()] == '/');
}

// The input is a name relative to the workspace folder, which holds a
// product: "product.xml?c=sigma", "product.xml:Calibration Type:Beta", "."
// and the like. It is normalised and resolved as the driver does; a name
// that resolves to a file of the folder is then opened by the host.
Outcome DatasetName(const uint8_t *data, size_t size) {
    host::ClearWarnings();
    const Workspace &workspace = Workspace::Of("dataset_name");
    const auto *text = reinterpret_cast<const char *>(data);
    const std::string input(text,
                            strnlen(text, std::min(size, kMaxNameLength)));
    const std::string name = workspace.Folder() + "/" + input;
    std::string resolved;
    Outcome parsed = Attempt([&] {
        host::HostText canonical(NormalizeDatasetName(name.c_str()));
        if (canonical)
            resolved = ParseFileName(canonical.get()).GetNormalizedName();
    });
    if (!parsed.accepted || !InsideWorkspace(resolved, workspace))
        return parsed.accepted ? Outcome{false, "outside the workspace"}
                               : parsed;
    return OpenAndDescribe(name);
}

Outcome TiffWindow(const uint8_t *data, size_t size) {
    host::ClearWarnings();
    const Workspace &workspace = Workspace::Of("tiff_window");
    const std::string path = workspace.Write("image.tif", data, size);
    // Anything else would be offered to the driver as a product description.
    if (!host::HasTiffSignature(path))
        return {false, "no TIFF signature"};
    return OpenAndDescribe(path);
}

Outcome TextSegment(const uint8_t *data, size_t size) {
    host::ClearWarnings();
    const Workspace &workspace = WorkspaceFor("text_segment", data, size);
    workspace.Write("product.xml", data, size);
    return Attempt([&] {
        const host::Raster raster = host::OpenRaster(workspace.ProductXml());
        raster.TextLines();
        raster.Segments();
    });
}

// The input is a whole product folder (see FolderArchive.hpp): its name,
// its description, side file, tables, images and links all come from the
// fuzzer. The product is opened calibrated, described and read.
Outcome ProductFolder(const uint8_t *data, size_t size) {
    host::ClearWarnings();
    const Workspace &workspace = Workspace::Of("product_folder");
    static const std::string root = [&] {
        const std::string path = workspace.File("in");
        std::filesystem::create_directory(path);
        return path;
    }();
    const std::string folder = UnpackProductFolder(root, data, size);
    return Both(LoadAndRead(folder + "/product.xml", "sigma"),
                OpenAndDescribe(folder + "/product.xml?c=sigma"));
}

const Target kTargets[] = {
    {"product_xml", ProductXml},       {"lut", LookupTableFile},
    {"side_file", SideFile},           {"dataset_name", DatasetName},
    {"tiff_window", TiffWindow},       {"text_segment", TextSegment},
    {"product_folder", ProductFolder},
};

} // namespace

const Target *FindTarget(const std::string &name) {
    for (const Target &target : kTargets)
        if (name == target.name)
            return &target;
    return nullptr;
}

} // namespace rs2fuzz
