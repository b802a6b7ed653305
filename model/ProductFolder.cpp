#include "model/ProductFolder.hpp"

#include "host/HostMemory.hpp"

#include <cstdlib>
#include <sys/stat.h>

namespace {

// The canonical absolute form of path, or empty when it cannot be resolved
// (nothing there, a loop of links, no permission to look).
std::string CanonicalPath(const std::string &path) {
    host::HostText resolved(::realpath(path.c_str(), nullptr));
    return resolved ? std::string(resolved.get()) : std::string();
}

bool LiesWithin(const std::string &path, const std::string &folder) {
    if (folder == "/")
        return path.size() > 1 && path.front() == '/';
    return path.size() > folder.size() + 1 &&
           path.compare(0, folder.size(), folder) == 0 &&
           path[folder.size()] == '/';
}

bool IsRegularFile(const std::string &path) {
    struct stat info {};
    return ::stat(path.c_str(), &info) == 0 && S_ISREG(info.st_mode);
}

} // namespace

ProductFile ResolveProductFile(const char *folder, const char *name) {
    const std::string directory =
        folder != nullptr && *folder != '\0' ? folder : "./";
    ProductFile file;
    file.path = (folder != nullptr ? folder : "") +
                std::string(name != nullptr ? name : "");
    const std::string canonicalFolder = CanonicalPath(directory);
    const std::string canonical = CanonicalPath(directory + (name ? name : ""));
    if (canonicalFolder.empty() || canonical.empty())
        return file;
    if (!LiesWithin(canonical, canonicalFolder))
        file.place = ProductFilePlace::Outside;
    else if (!IsRegularFile(canonical))
        file.place = ProductFilePlace::NotRegular;
    else {
        file.place = ProductFilePlace::Inside;
        file.path = canonical;
    }
    return file;
}

std::string UnreadableProductFileText(const ProductFile &file) {
    const char *reason = "no such file";
    if (file.place == ProductFilePlace::Outside)
        reason = "it leads out of the product folder";
    else if (file.place == ProductFilePlace::NotRegular)
        reason = "not a regular file";
    return "cannot open " + file.path + ": " + reason;
}
