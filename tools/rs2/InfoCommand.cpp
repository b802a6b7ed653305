#include "tools/rs2/CalibrationCheck.hpp"
#include "tools/rs2/Commands.hpp"
#include "tools/rs2/DatasetChoice.hpp"
#include "tools/rs2/DatasetJson.hpp"
#include "tools/rs2/DatasetPaths.hpp"
#include "tools/rs2/JsonText.hpp"

#include "host/RasterServices.hpp"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <regex>
#include <utility>

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

// Decimals: the text with its trailing zeros dropped, but at least two.
std::string TrimmedDecimals(std::string text) {
    const size_t point = text.find('.');
    if (point == std::string::npos)
        return text;
    const size_t keep = std::max(text.find_last_not_of('0') + 1, point + 3);
    return text.substr(0, std::min(keep, text.size()));
}

// Product.xml writes many values in exponent form ("3.64000000e+01");
// people read them as plain decimals ("36.40"), with the precision the
// text gives. Other texts, and exponents too large to spell out, stay.
std::string PlainDecimal(const std::string &text) {
    static const std::regex exponentForm(
        "[-+]?[0-9]+(\\.([0-9]+))?[eE]([-+]?[0-9]+)");
    std::smatch parts;
    if (!std::regex_match(text, parts, exponentForm))
        return text;
    const int exponent = std::atoi(parts[3].str().c_str());
    if (exponent < -15 || exponent > 15)
        return text;
    const int decimals =
        std::max(static_cast<int>(parts[2].length()) - exponent, 0);
    char plain[64];
    std::snprintf(plain, sizeof plain, "%.*f", decimals,
                  std::strtod(text.c_str(), nullptr));
    return TrimmedDecimals(plain);
}

void Row(const std::string &label, const std::string &value) {
    if (!value.empty())
        std::printf("  %-22s %s\n", label.c_str(), PlainDecimal(value).c_str());
}

std::string ChannelTypeName(int32_t code) {
    switch (code) {
    case kChanUInt8:
        return "uint8";
    case kChanUInt16:
        return "uint16";
    case kChanInt16:
        return "int16";
    case kChanInt32:
        return "int32";
    case kChanUInt32:
        return "uint32";
    case kChanFloat32:
        return "float32";
    case kChanComplexInt16:
        return "complex int16";
    case kChanComplexFloat32:
        return "complex float32";
    }
    return "type " + std::to_string(code);
}

// The coordinate system with its EPSG code where the text fixes one: WGS 84
// geographic, or WGS 84 UTM with the hemisphere its latitude band gives
// (bands C to M south, N to X north).
std::string GeosysWithEpsg(const std::string &geosys) {
    static const std::regex utm("UTM ([0-9]{1,2}) ([C-HJ-NP-X]) D000");
    std::smatch parts;
    int epsg = 0;
    if (geosys == "LONG D000") {
        epsg = 4326;
    } else if (std::regex_match(geosys, parts, utm)) {
        const int zone = std::atoi(parts[1].str().c_str());
        if (zone >= 1 && zone <= 60)
            epsg = (parts[2].str()[0] >= 'N' ? 32600 : 32700) + zone;
    }
    return epsg == 0 ? geosys : geosys + " (EPSG:" + std::to_string(epsg) + ")";
}

// The affine transform's misfit against the geolocation grid, e.g.
// "max 4210.3 m, RMS 3012.8 m over 231 tie points".
std::string MisfitText(const json &misfit) {
    if (misfit.is_null())
        return "not measured";
    char text[160];
    std::snprintf(text, sizeof text,
                  "max %.1f m, RMS %.1f m over %zu tie points",
                  misfit["max_m"].get<double>(), misfit["rms_m"].get<double>(),
                  misfit["tie_points"].get<size_t>());
    return text;
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
    const std::string tidy = TidyPath(path);
    return std::filesystem::is_regular_file(path, error) ? tidy
                                                         : tidy + " (missing)";
}

std::string JoinFiles(const json &list) {
    std::string text;
    for (const auto &item : list)
        text += (text.empty() ? "" : ", ") + FileText(item);
    return text;
}

// unapplied: why a calibration the name asked for is not applied, or "".
void PrintSummary(const json &info, const std::string &unapplied) {
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
    const std::string applied = Entry(info, "SAR_Calibration");
    Row("applied",
        unapplied.empty() ? applied : applied + " (" + unapplied + ")");
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
            channel["description"].get<std::string>() + " (" +
                ChannelTypeName(channel["type"].get<int>()) + ")");
    Heading("Georeferencing");
    Row("coordinate system", GeosysWithEpsg(info["projection"]["geosys"]));
    Row("ground control points", std::to_string(info["gcps"]["points"].size()));
    Row("affine misfit", MisfitText(info["affine_misfit"]));
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
        "file:// URI. A calibration the name asks for that cannot be "
        "applied is told on stderr and shown beside the calibration applied. "
        "JSON text is UTF-8: a byte of a product file that is not part of "
        "UTF-8 text is taken as Latin-1 (byte 0xE9 becomes U+00E9).\n"
        "Examples:\n  rs2 info dir\n  rs2 info "
        "'dir/product.xml?c=sigma' --json");
    command->callback([] {
        host::Raster raster = OpenDataset(name);
        const std::string unapplied = UnappliedCalibration(raster);
        if (!unapplied.empty())
            std::cerr << "rs2: warning: " << unapplied << "\n";
        nlohmann::json info = DescribeDataset(raster);
        if (asJson)
            std::cout << JsonText(std::move(info), 2) << "\n";
        else
            PrintSummary(info, unapplied);
    });
}
