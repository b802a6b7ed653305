#include "tools/rs2/CalibrationCheck.hpp"

#include "tools/rs2/DatasetChoice.hpp"
#include "tools/rs2/DatasetPaths.hpp"

#include "host/ErrorReports.hpp"

#include <algorithm>
#include <cctype>
#include <stdexcept>
#include <vector>

namespace {

std::string LowerCase(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(),
                   [](unsigned char c) { return std::tolower(c); });
    return text;
}

// The "c" member of the name's query, lower-cased. The host names a dataset
// by its canonical name, which carries every choice as that member,
// whichever form the user gave.
std::string QueryChoice(const std::string &name) {
    const size_t query = name.find('?');
    if (query == std::string::npos)
        return "";
    const size_t fragment = name.find('#');
    const std::string members = name.substr(
        query + 1,
        fragment == std::string::npos ? fragment : fragment - query - 1);
    for (size_t start = 0; start <= members.size();) {
        const size_t end = std::min(members.find('&', start), members.size());
        if (members.compare(start, 2, "c=") == 0)
            return LowerCase(members.substr(start + 2, end - start - 2));
        start = end + 1;
    }
    return "";
}

// The calibration as product.xml and the calibration list spell it.
std::string KindName(const std::string &choice) {
    if (choice == "sigma")
        return "Sigma Nought";
    if (choice == "beta")
        return "Beta Nought";
    if (choice == "gamma")
        return "Gamma";
    return choice;
}

std::string FirstLine(const std::string &text) {
    return text.substr(0, text.find('\n'));
}

// The driver's warnings about the table of the chosen kind, first lines
// joined: the one that says calibration is off, and those before it that
// name the table's file (why the table was refused, which the other does
// not say).
std::string Reason(const host::Raster &raster, const std::string &choice) {
    std::vector<std::string> tableFiles;
    for (const LookupTableName &table : LookupTableNames(raster))
        if (LowerCase(table.attributes).find(choice) != std::string::npos)
            tableFiles.push_back(table.fileName);
    std::string reason;
    for (const std::string &warning : host::Warnings()) {
        const bool off =
            LowerCase(warning).find("calibration") != std::string::npos;
        const bool namesTable = std::any_of(
            tableFiles.begin(), tableFiles.end(), [&](const std::string &file) {
                return warning.find(file) != std::string::npos;
            });
        if (off || namesTable)
            reason += (reason.empty() ? "" : " ") + FirstLine(warning);
        if (off)
            return reason;
    }
    return "the driver serves this dataset uncalibrated";
}

} // namespace

std::string UnappliedCalibration(const host::Raster &raster) {
    const std::string choice = QueryChoice(raster.Name());
    if (choice.empty() || choice == "none")
        return "";
    if (LowerCase(MetadataValue(raster, "SAR_Calibration")) != "none")
        return "";
    return KindName(choice) +
           " calibration not applied: " + Reason(raster, choice);
}

void RequireAppliedCalibration(const host::Raster &raster) {
    const std::string unapplied = UnappliedCalibration(raster);
    if (!unapplied.empty())
        throw std::runtime_error(unapplied);
}
