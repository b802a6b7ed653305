#include "product/SideFile.hpp"

#include "host/ErrorReports.hpp"
#include "host/StringLists.hpp"
#include "host/fileio/File.hpp"
#include "model/ProductFolder.hpp"
#include "product/BoundedFileRead.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "product/StringListKeeper.hpp"

#include <memory>
#include <string>

#include <boost/algorithm/string/trim.hpp>

namespace {

using orv::core::fileio::File;

// ProductDescription.self in the folder of the product description, which a
// link must not lead out of: its key = value lines would become metadata.
ProductFile SideFileOf(const char *productPath) {
    std::unique_ptr<File> product = File::Create(productPath);
    if (!product)
        return ProductFile{};
    return ResolveProductFile(product->GetPath().c_str(),
                              "ProductDescription.self");
}

// The largest side file read. A real one holds a few KB of key = value
// lines; the limit leaves room for generated ones of many thousand lines
// while what a file can cost stays bounded.
constexpr std::size_t kMaxSideFileBytes = 16u << 20;

// The whole file; an unreadable file reads as empty, and so does one too
// large to be a side file, after a warning naming it.
std::string ReadWholeFile(const std::string &path) {
    FileBytes file = ReadFileUpTo(path.c_str(), kMaxSideFileBytes);
    if (file.status == FileReadStatus::TooLarge)
        IMPError(-1, host::kWarning,
                 "The side file %s holds more than %s, far more than a "
                 "product's description needs; it is not read",
                 path.c_str(), SizeText(kMaxSideFileBytes).c_str());
    return std::move(file.bytes);
}

// Lines that describe the archive's band layout, or that a conversion from
// XML left behind, carry nothing for the metadata.
bool IsIgnoredKey(const std::string &key) {
    return key == "#text" || key == "bandsInArchive" || key == "bands";
}

// Two keys of the side file have names of their own in the host vocabulary.
std::string HostKey(const std::string &key) {
    if (key == "sourceInfo_startTime")
        return "Acquisition_StartTime";
    if (key == "sourceInfo_endTime")
        return "Acquisition_EndTime";
    return key;
}

// Turns "key = value;" lines into entries. A line with nothing after its '='
// opens a section whose name prefixes the keys of the lines that follow.
class SideFileParser {
  public:
    void ParseLine(std::string line) {
        boost::algorithm::trim(line);
        std::string::size_type equals = line.find('=');
        if (equals == std::string::npos)
            return;
        std::string key = boost::algorithm::trim_copy(line.substr(0, equals));
        if (IsIgnoredKey(key))
            return;
        std::string::size_type valueStart = equals + 1;
        std::string::size_type semicolon = line.find(';', valueStart);
        std::string value =
            line.substr(valueStart, semicolon == std::string::npos
                                        ? std::string::npos
                                        : semicolon - valueStart);
        if (value.empty()) {
            section = key;
            return;
        }
        boost::algorithm::trim(value);
        std::string fullKey = section.empty() ? key : section + "_" + key;
        entries.Set(HostKey(fullKey).c_str(), value.c_str());
    }

    char **Release() { return entries.Release(); }

  private:
    std::string section;
    StringListKeeper entries;
};

} // namespace

char **ReadSideFile(const ProductReader &reader) {
    if (reader.productPath == nullptr)
        return nullptr;
    const ProductFile sideFile = SideFileOf(reader.productPath);
    if (sideFile.place == ProductFilePlace::Missing)
        return nullptr;
    if (sideFile.place != ProductFilePlace::Inside) {
        IMPError(-1, host::kWarning, "%s",
                 UnreadableProductFileText(sideFile).c_str());
        return nullptr;
    }
    SideFileParser parser;
    for (std::string &line : SplitTokens(ReadWholeFile(sideFile.path), "\n")) {
        if (!line.empty())
            parser.ParseLine(std::move(line));
    }
    return parser.Release();
}
