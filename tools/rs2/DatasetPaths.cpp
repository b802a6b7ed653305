#include "tools/rs2/DatasetPaths.hpp"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <regex>
#include <stdexcept>
#include <sys/stat.h>

namespace {

constexpr char kFileScheme[] = "file://";
constexpr char kCalibrationSuffix[] = ":calibration type:";

bool StartsWithIgnoringCase(const std::string &text, size_t at,
                            const std::string &prefix) {
    if (text.size() - at < prefix.size())
        return false;
    return std::equal(prefix.begin(), prefix.end(), text.begin() + at,
                      [](char a, char b) {
                          return std::tolower(static_cast<unsigned char>(a)) ==
                                 std::tolower(static_cast<unsigned char>(b));
                      });
}

int HexValue(char c) {
    if (c >= '0' && c <= '9')
        return c - '0';
    if (c >= 'a' && c <= 'f')
        return c - 'a' + 10;
    if (c >= 'A' && c <= 'F')
        return c - 'A' + 10;
    return -1;
}

// "%20" and its kind become the bytes they encode; a '%' that starts no
// escape stays as it is.
std::string PercentDecoded(const std::string &text) {
    std::string decoded;
    for (size_t i = 0; i < text.size(); ++i) {
        const int high = i + 2 < text.size() ? HexValue(text[i + 1]) : -1;
        const int low = i + 2 < text.size() ? HexValue(text[i + 2]) : -1;
        if (text[i] == '%' && high >= 0 && low >= 0) {
            decoded += static_cast<char>(high * 16 + low);
            i += 2;
        } else {
            decoded += text[i];
        }
    }
    return decoded;
}

// file:///abs/path and file://localhost/abs/path name /abs/path.
std::string UriPath(const std::string &uri) {
    const size_t pathStart = uri.find('/', sizeof kFileScheme - 1);
    if (pathStart == std::string::npos)
        return "";
    const size_t pathEnd = uri.find_first_of("?#", pathStart);
    return PercentDecoded(uri.substr(pathStart, pathEnd - pathStart));
}

bool Exists(const std::string &path) {
    struct stat info {};
    return !path.empty() && ::stat(path.c_str(), &info) == 0;
}

} // namespace

std::string FilePartOf(const std::string &name) {
    if (StartsWithIgnoringCase(name, 0, kFileScheme))
        return UriPath(name);
    if (name.find("://") != std::string::npos)
        return "";
    const size_t query = name.find('?');
    if (query != std::string::npos)
        return name.substr(0, query);
    const size_t slash = name.rfind('/');
    for (size_t colon = name.find(':', slash == std::string::npos ? 0 : slash);
         colon != std::string::npos; colon = name.find(':', colon + 1))
        if (StartsWithIgnoringCase(name, colon, kCalibrationSuffix))
            return name.substr(0, colon);
    return name;
}

void RequireExistingFile(const std::string &name) {
    const std::string path = FilePartOf(name);
    if (path.empty() || Exists(name) || Exists(path))
        return;
    if (errno == ENOENT || errno == ENOTDIR)
        throw std::runtime_error("cannot open " + path + ": no such file");
}

std::string TidyPath(const std::string &path) {
    std::string tidy;
    for (size_t i = 0; i < path.size(); ++i) {
        const bool afterSlash = !tidy.empty() && tidy.back() == '/';
        if (afterSlash && path[i] == '/')
            continue;
        if (afterSlash && path.compare(i, 2, "./") == 0) {
            ++i;
            continue;
        }
        tidy += path[i];
    }
    return tidy;
}

std::vector<LookupTableName> LookupTableNames(const host::Raster &raster) {
    static const std::regex element(
        "<lookupTable([^>]*)>([^<]+)</lookupTable>");
    std::vector<LookupTableName> tables;
    for (const std::string &line : raster.TextLines()) {
        if (line.find("<lookupTable") == std::string::npos)
            continue; // the quick test spares the regex most lines
        for (std::sregex_iterator match(line.begin(), line.end(), element), end;
             match != end; ++match)
            tables.push_back({(*match)[1].str(), (*match)[2].str()});
    }
    return tables;
}
