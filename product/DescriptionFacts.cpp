#include "product/DescriptionFacts.hpp"

#include "product/CalibrationTables.hpp"
#include "product/DocumentAccess.hpp"

#include <xercesc/dom/DOMElement.hpp>
#include <xercesc/dom/DOMNamedNodeMap.hpp>

#include <deque>
#include <mutex>
#include <sys/stat.h>
#include <utility>

namespace {

constexpr size_t kKeptDescriptions = 4;

// A file as it was when it was read.
struct FileIdentity {
    dev_t device = 0;
    ino_t inode = 0;
    off_t size = 0;
    timespec modified{};

    bool operator==(const FileIdentity &other) const {
        return device == other.device && inode == other.inode &&
               size == other.size && modified.tv_sec == other.modified.tv_sec &&
               modified.tv_nsec == other.modified.tv_nsec;
    }
};

std::optional<FileIdentity> IdentityOf(const char *path) {
    struct stat info {};
    if (path == nullptr || stat(path, &info) != 0)
        return std::nullopt;
    return FileIdentity{info.st_dev, info.st_ino, info.st_size, info.st_mtim};
}

struct KeptFacts {
    FileIdentity file;
    DescriptionFacts facts;
};

std::mutex keptLock;
std::deque<KeptFacts> kept; // most recent first

} // namespace

DescriptionFacts FactsOfDescription(const xercesc::DOMDocument *document) {
    DescriptionFacts facts;
    for (const xercesc::DOMElement *element :
         ElementsByTag(document, "fullResolutionImageData")) {
        const xercesc::DOMNamedNodeMap *attributes = element->getAttributes();
        const XMLSize_t count =
            attributes != nullptr ? attributes->getLength() : 0;
        const std::string text = NodeText(element);
        for (XMLSize_t a = 0; a < count; ++a)
            facts.imageEntries.push_back(text);
    }
    facts.calibrationTypes = CalibrationTypeNames(document);
    return facts;
}

void RememberDescriptionFacts(const char *path, DescriptionFacts facts) {
    const std::optional<FileIdentity> file = IdentityOf(path);
    if (!file)
        return;
    const std::lock_guard<std::mutex> hold(keptLock);
    for (auto entry = kept.begin(); entry != kept.end(); ++entry)
        if (entry->file == *file) {
            kept.erase(entry);
            break;
        }
    kept.push_front({*file, std::move(facts)});
    if (kept.size() > kKeptDescriptions)
        kept.pop_back();
}

std::optional<DescriptionFacts> RecalledDescriptionFacts(const char *path) {
    const std::optional<FileIdentity> file = IdentityOf(path);
    if (!file)
        return std::nullopt;
    const std::lock_guard<std::mutex> hold(keptLock);
    for (const KeptFacts &entry : kept)
        if (entry.file == *file)
            return entry.facts;
    return std::nullopt;
}
