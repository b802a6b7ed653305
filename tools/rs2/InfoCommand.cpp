#include "tools/rs2/Commands.hpp"

#include "tools/rs2/DatasetJson.hpp"

#include <cstdio>
#include <filesystem>
#include <iostream>

namespace {

using nlohmann::json;

// The value of a metadata entry, or "" when the dataset has none.
std::string Entry(const json &info, const std::string &key) {
    for (const auto &pair : info["metadata"])
        if (pair[0] == key)
            return pair[1];
    return "";
}

void Heading(const char *title) { std::printf("\n%s\n", title); }

void Row(const std::string &label, const std::string &value) {
    if (!value.empty())
        std::printf("  %-22s %s\n", label.c_str(), value.c_str());
}

void RowsFromEntries(
    const json &info,
    const std::vector<std::pair<const char *, const char *>> &labelsAndKeys) {
    for (const auto &[label, key] : labelsAndKeys)
        Row(label, Entry(info, key));
}

// The file lists name what product.xml names, present or not; a reader
// should see at once that an image is missing (its channel reads nothing).
std::string FileText(const std::string &path) {
    std::error_code error;
    return std::filesystem::is_regular_file(path, error) ? path
                                                         : path + " (missing)";
}

std::string JoinFiles(const json &list) {
    std::string text;
    for (const auto &item : list)
        text += (text.empty() ? "" : ", ") + FileText(item);
    return text;
}

void PrintSummary(const json &info) {
    std::printf("%s\n", info["name"].get<std::string>().c_str());
    Heading("Product");
    RowsFromEntries(info, {{"type", "ProductType"},
                           {"id", "productId"},
                           {"platform", "PlatformName"},
                           {"beam mode", "BeamMode"},
                           {"acquisition", "Acquisition_Type"},
                           {"polarizations", "Polarizations"},
                           {"matrix", "Matrix_Type"}});
    Heading("Acquisition");
    RowsFromEntries(info, {{"date and time", "Acquisition_DateTime"},
                           {"first line", "TimeOfFirstLine"},
                           {"last line", "TimeOfLastLine"},
                           {"orbit direction", "OrbitDirection"},
                           {"look direction", "LookDirection"},
                           {"wavelength (m)", "RadarCenterWavelength"}});
    Heading("Geometry");
    Row("size", std::to_string(info["width"].get<int>()) + " x " +
                    std::to_string(info["height"].get<int>()) + " pixels");
    Row("looks (range x az.)",
        Entry(info, "NumRangeLooks") + " x " + Entry(info, "NumAzimuthLooks"));
    RowsFromEntries(info, {{"pixel spacing (m)", "SpatialResolutionX"},
                           {"line spacing (m)", "SpatialResolutionY"},
                           {"incidence near (deg)", "IncidenceNearAngle"},
                           {"incidence far (deg)", "IncidenceFarAngle"},
                           {"slant range near (m)", "SlantRangeNearEdge"},
                           {"slant range far (m)", "SlantRangeFarEdge"}});
    Heading("Calibration");
    RowsFromEntries(info, {{"applied", "SAR_Calibration"}});
    std::string offered;
    for (const auto &type : info["calibration_types"]) {
        // Entries read ":Calibration Type:<kind>"; people want the kind.
        std::string text = type.get<std::string>();
        size_t colon = text.rfind(':');
        offered += (offered.empty() ? "" : ", ") + text.substr(colon + 1);
    }
    Row("offered", offered);
    Heading("Channels");
    for (const auto &channel : info["channels"])
        Row("channel " + std::to_string(channel["number"].get<int>()),
            channel["description"].get<std::string>() + " (type " +
                std::to_string(channel["type"].get<int>()) + ")");
    Heading("Georeferencing");
    Row("coordinate system", info["projection"]["geosys"]);
    Row("ground control points", std::to_string(info["gcps"]["points"].size()));
    Row("RPC model", info["rpc"].is_null() ? "none" : "yes");
    Row("orbit state vectors",
        info["orbit"].is_null()
            ? "none"
            : std::to_string(info["orbit"]["state_vectors"].size()));
    Heading("Segments");
    for (const auto &segment : info["segments"])
        Row(std::to_string(segment["type"].get<int>()),
            segment["description"].get<std::string>());
    Heading("Files");
    Row("images", JoinFiles(info["files"]["images"]));
    const std::string browse = info["files"]["browse"];
    Row("browse", browse.empty() ? browse : FileText(browse));
    Row("auxiliary", JoinFiles(info["files"]["auxiliary"]));
    for (const auto &warning : info["warnings"])
        std::printf("warning: %s\n", warning.get<std::string>().c_str());
}

} // namespace

void AddInfoCommand(CLI::App &app) {
    CLI::App *command = app.add_subcommand(
        "info", "Describe a dataset: size, channels, metadata, segments");
    static std::string name;
    static bool asJson = false;
    command->add_option("NAME", name, "dataset name (product.xml, ...)")
        ->required();
    command->add_flag("--json", asJson, "print one JSON object");
    command->footer(
        "NAME is product.xml, the product folder, product.xml?c=sigma "
        "(beta, gamma), product.xml:Calibration Type:Sigma Nought or a "
        "file:// URI.\nExamples:\n  rs2 info dir\n  rs2 info "
        "'dir/product.xml?c=sigma' --json");
    command->callback([] {
        host::Raster raster = host::OpenRaster(name);
        nlohmann::json info = DescribeDataset(raster);
        if (asJson)
            std::cout << info.dump(2) << "\n";
        else
            PrintSummary(info);
    });
}
