#include "driver/FileInventory.hpp"

#include "driver/DatasetNames.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "host/XmlUtil.hpp"
#include "host/fileio/DataSourceFactory.hpp"
#include "host/fileio/URI.hpp"
#include "product/DescriptionFacts.hpp"
#include "product/DocumentAccess.hpp"

#include <memory>
#include <optional>
#include <string>
#include <vector>

using orv::core::fileio::DataSource;
using orv::core::fileio::DataSourceFactory;
using orv::core::fileio::File;
using orv::core::fileio::URI;

namespace {

const char *const kLookupTableFiles[] = {"lutBeta.xml", "lutGamma.xml",
                                         "lutSigma.xml"};

std::string HandleName(FILE *handle) {
    const char *name = fp2filename(handle);
    return name ? name : "";
}

// The folder of the dataset and its calibration choice. A canonical name is
// either the URI form (with the choice) or a plain file name, which need not
// be a valid URI (it may hold spaces), so each form is read as what it is.
struct DatasetLocation {
    std::string directory;
    std::string choice;
};

DatasetLocation LocateDataset(const std::string &name) {
    std::unique_ptr<DataSource> source =
        DataSourceFactory::GetInstance()->Create(name);
    if (auto *uri = dynamic_cast<URI *>(source.get()))
        return {File(*uri).GetPath(), uri->GetFirstValue("c")};
    return {static_cast<File &>(*source).GetPath(), ""};
}

char **AddIfPresent(char **list, const std::string &path) {
    return DKCheck(path.c_str()) ? AddStringToList(list, path.c_str()) : list;
}

// One entry per image element attribute: the image's name under the
// product folder.
char **ImageEntryList(const std::vector<std::string> &entries,
                      const std::string &directory) {
    char **list = nullptr;
    for (const std::string &text : entries) {
        std::unique_ptr<char, decltype(&std::free)> entry(
            HString(MkName("%s//%s", directory.c_str(), text.c_str())),
            &std::free);
        list = AddStringToList(list, entry.get());
    }
    return list;
}

} // namespace

char **ListAuxiliaryFiles(FILE *handle) {
    DatasetLocation location = LocateDataset(HandleName(handle));
    char **list = nullptr;
    for (const char *table : kLookupTableFiles)
        list = AddIfPresent(list, location.directory + table);
    std::string choice = location.choice;
    if (size_t space = choice.find(' '); space != std::string::npos)
        choice[space] = '_';
    list = AddIfPresent(list, location.directory + "product.xml_c_" + choice +
                                  ".pox");
    return AddIfPresent(list, location.directory + "readme.txt");
}

std::string BrowseImageFile(FILE *handle) {
    return ParseFileName(HandleName(handle)).GetPath() + "BrowseImage.tif";
}

char **ListImageFiles(FILE *handle) {
    File file = ParseFileName(HandleName(handle));
    const std::string description = file.GetNormalizedName();
    std::optional<DescriptionFacts> facts =
        RecalledDescriptionFacts(description.c_str());
    if (!facts) {
        DocumentParse parse(description.c_str());
        if (parse.Document() == nullptr)
            return nullptr;
        facts = FactsOfDescription(parse.Document());
    }
    return ImageEntryList(facts->imageEntries, file.GetPath());
}
