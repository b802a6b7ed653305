#include "host/fileio/File.hpp"

#include "host/Exception.hpp"
#include "host/TextServices.hpp"
#include "host/fileio/URI.hpp"

#include <filesystem>
#include <system_error>
#include <vector>

#include <uriparser/Uri.h>

namespace orv::core::fileio {

namespace {

// A file name split into the parts that SetBasename and SetExtension replace.
struct NameParts {
    std::string directory; // with its trailing '/', or empty
    std::string stem;
    std::string extension; // with its '.', or empty
};

NameParts SplitFileName(const std::string &fileName) {
    NameParts parts;
    std::string::size_type slash = fileName.rfind('/');
    parts.directory =
        slash == std::string::npos ? "" : fileName.substr(0, slash + 1);
    std::string base = fileName.substr(parts.directory.size());
    // A leading dot names a hidden file; it does not start an extension.
    std::string::size_type dot = base.rfind('.');
    if (dot == std::string::npos || dot == 0) {
        parts.stem = base;
    } else {
        parts.stem = base.substr(0, dot);
        parts.extension = base.substr(dot);
    }
    return parts;
}

// The '/' that precedes it lets a directory name hold a ':' without starting
// the extended information.
std::string::size_type ExtendedInfoStart(const std::string &name) {
    std::string::size_type slash = name.rfind('/');
    return name.find(':', slash == std::string::npos ? 0 : slash + 1);
}

bool IsLocalAuthority(std::string authority) {
    LCaseString(authority.data());
    return authority.empty() || authority == "localhost";
}

// A file is named by a file URI on this machine or by a scheme-less
// reference; anything else would need a transfer this host does not make.
std::string FilePathOf(const URI &uri) {
    bool fileScheme = uri.Scheme().empty() || uri.Scheme() == "file";
    if (!fileScheme || !IsLocalAuthority(uri.Authority()))
        throw orv::Exception("Not a local file URI \"" + uri.ToString() + "\"",
                             "", "", 0);
    return uri.DecodedPath();
}

std::string PercentEncode(const std::string &segment) {
    // uriparser needs room for every byte written as three.
    std::vector<char> encoded(segment.size() * 3 + 1);
    char *end = uriEscapeExA(segment.data(), segment.data() + segment.size(),
                             encoded.data(), URI_FALSE, URI_FALSE);
    return std::string(encoded.data(), end);
}

// Each segment is encoded on its own so that the '/' between them stays a
// path separator.
std::string PercentEncodePath(const std::string &path) {
    std::string encoded;
    std::string::size_type start = 0;
    for (;;) {
        std::string::size_type slash = path.find('/', start);
        encoded += PercentEncode(path.substr(start, slash - start));
        if (slash == std::string::npos)
            return encoded;
        encoded += '/';
        start = slash + 1;
    }
}

std::filesystem::path CurrentDirectory(const std::string &forName) {
    std::error_code error;
    std::filesystem::path directory = std::filesystem::current_path(error);
    if (error)
        throw orv::Exception("Cannot make \"" + forName +
                                 "\" absolute: " + error.message(),
                             "", "", 0);
    return directory;
}

} // namespace

File::File(const std::string &name) {
    std::string::size_type start = ExtendedInfoStart(name);
    fileName = name.substr(0, start);
    if (start != std::string::npos)
        extendedInfo = name.substr(start);
}

File::File(const URI &uri) : File(FilePathOf(uri)) {}

File::File(const std::string &fileNameIn, const std::string &extendedInfoIn)
    : fileName(fileNameIn), extendedInfo(extendedInfoIn) {}

File::~File() = default;

std::unique_ptr<File> File::Create(const std::string &name) {
    if (name.empty())
        return nullptr;
    return std::make_unique<File>(name);
}

std::string File::ToString() const { return fileName + extendedInfo; }

std::string File::GetPath() const { return SplitFileName(fileName).directory; }

std::string File::GetNormalizedName() const {
    std::filesystem::path path(fileName);
    if (path.is_relative())
        path = CurrentDirectory(fileName) / path;
    std::string normalized = path.lexically_normal().string();
    // A name that ends in a folder ("dir/", "dir/.") names the folder itself.
    if (normalized.size() > 1 && normalized.back() == '/')
        normalized.pop_back();
    return normalized;
}

std::unique_ptr<URI> File::ToURI() const {
    return std::make_unique<URI>("file://" +
                                 PercentEncodePath(GetNormalizedName()));
}

std::unique_ptr<File> File::SetExtendedInfo(const std::string &info) const {
    // The ':' is what makes the text extended information when the name is
    // read back, so one is supplied when info lacks it.
    bool hasColon = info.empty() || info.front() == ':';
    return std::unique_ptr<File>(
        new File(fileName, hasColon ? info : ":" + info));
}

std::unique_ptr<File> File::SetBasename(const std::string &basename) const {
    NameParts parts = SplitFileName(fileName);
    return std::unique_ptr<File>(
        new File(parts.directory + basename + parts.extension, extendedInfo));
}

std::unique_ptr<File> File::SetExtension(const std::string &extension) const {
    NameParts parts = SplitFileName(fileName);
    std::string dottedExtension = extension.empty() ? "" : "." + extension;
    return std::unique_ptr<File>(
        new File(parts.directory + parts.stem + dottedExtension, extendedInfo));
}

} // namespace orv::core::fileio
