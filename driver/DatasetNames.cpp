#include "driver/DatasetNames.hpp"

#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/TextServices.hpp"
#include "host/fileio/DataSourceFactory.hpp"
#include "host/fileio/QueryComponents.hpp"
#include "host/fileio/URI.hpp"

#include <algorithm>
#include <cctype>
#include <memory>

using orv::core::fileio::DataSource;
using orv::core::fileio::DataSourceFactory;
using orv::core::fileio::File;
using orv::core::fileio::QueryComponents;
using orv::core::fileio::URI;

namespace {

const std::string kCalibrationPrefix = ":calibration type:";
const char *const kCalibrationKey = "c";

std::string LowerCase(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(),
                   [](unsigned char c) { return std::tolower(c); });
    return text;
}

// A key other than "c" selects nothing; it is most likely a mistyped
// calibration choice, which would otherwise pass unnoticed.
void WarnOfUnknownKeys(const URI &uri, const std::string &name) {
    for (const QueryComponents::Pair &pair : uri.GetQueryComponents().Pairs())
        if (pair.first != kCalibrationKey)
            IMPError(-1, host::kWarning,
                     "The dataset name %s holds the unknown key \"%s\", "
                     "which is ignored; the only key known is \"%s\" (the "
                     "calibration: sigma, beta, gamma or none)",
                     name.c_str(), pair.first.c_str(), kCalibrationKey);
}

bool IsHexDigit(char c) {
    return std::isxdigit(static_cast<unsigned char>(c)) != 0;
}

// Whether some '%' of text does not begin a percent escape.
bool HasBadPercentEscape(const std::string &text) {
    for (std::size_t i = text.find('%'); i != std::string::npos;
         i = text.find('%', i + 1))
        if (i + 2 >= text.size() || !IsHexDigit(text[i + 1]) ||
            !IsHexDigit(text[i + 2]))
            return true;
    return false;
}

// The data source of a dataset name. A name that reads as a URI but holds a
// '%' that begins no escape is refused with a message that says so.
std::unique_ptr<DataSource> DataSourceOf(const std::string &name) {
    try {
        return DataSourceFactory::GetInstance()->Create(name);
    } catch (const orv::Exception &) {
        if (!HasBadPercentEscape(name))
            throw;
        throw orv::Exception("Invalid dataset name \"" + name +
                                 "\": a \"%\" must begin an escape of two "
                                 "hexadecimal digits (\"%25\" for a percent "
                                 "sign itself)",
                             "", "", 0);
    }
}

std::string NormalizeUriName(const URI &uri) {
    std::string choice = uri.GetFirstValue(kCalibrationKey);
    if (choice.empty())
        return uri.ToString();
    QueryComponents query = uri.GetQueryComponents();
    query.SetPair(kCalibrationKey, NormalizeCalibrationName(choice));
    return uri.SetQueryComponents(query)->ToString();
}

std::string NormalizeFileName(const File &file, const std::string &name) {
    const std::string &info = file.GetExtendedInfo();
    if (info.empty())
        return file.ToString();
    if (LowerCase(info).compare(0, kCalibrationPrefix.size(),
                                kCalibrationPrefix) != 0)
        return name;
    std::string choice =
        NormalizeCalibrationName(info.substr(kCalibrationPrefix.size()));
    std::unique_ptr<File> plain = file.SetExtendedInfo("");
    QueryComponents query;
    query.AddPair(kCalibrationKey, choice);
    std::unique_ptr<URI> base = plain->ToURI();
    return URI(*base, query).ToString();
}

} // namespace

std::string NormalizeCalibrationName(const std::string &text) {
    // Only names spelled with "nought" are shortened and capitalised
    // ("Sigma Nought" -> "Sigma"); others stay lower-cased ("Gamma" ->
    // "gamma").
    std::string lower = LowerCase(text);
    size_t found = lower.rfind("nought");
    if (found == std::string::npos)
        return lower;
    lower.resize(found > 0 && lower[found - 1] == ' ' ? found - 1 : found);
    if (!lower.empty())
        lower[0] = static_cast<char>(
            std::toupper(static_cast<unsigned char>(lower[0])));
    return lower;
}

char *NormalizeDatasetName(const char *name) {
    std::string text = name ? name : "";
    std::unique_ptr<DataSource> source = DataSourceOf(text);
    std::string normalized;
    if (auto *uri = dynamic_cast<URI *>(source.get())) {
        WarnOfUnknownKeys(*uri, text);
        normalized = NormalizeUriName(*uri);
    } else
        normalized = NormalizeFileName(static_cast<File &>(*source), text);
    return HString(normalized.c_str());
}

File ParseFileName(const std::string &name) {
    try {
        std::unique_ptr<DataSource> source =
            DataSourceFactory::GetInstance()->Create(name);
        if (auto *file = dynamic_cast<File *>(source.get()))
            return *file;
        if (auto *uri = dynamic_cast<URI *>(source.get()))
            return File(*uri);
    } catch (...) {
        // Any failure to make a file of the name is the error below.
    }
    throw orv::Exception("Could not parse filename \"" + name + "\"", "", "",
                         0);
}
