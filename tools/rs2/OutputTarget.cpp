#include "tools/rs2/OutputTarget.hpp"

#include "tools/rs2/DatasetPaths.hpp"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <stdexcept>
#include <sys/stat.h>
#include <unistd.h>

namespace {

void AddIfPresent(const std::string &path, std::vector<DatasetFile> &files) {
    struct stat info {};
    if (!path.empty() && ::stat(path.c_str(), &info) == 0)
        files.push_back({TidyPath(path), info.st_dev, info.st_ino});
}

// What a target that is not a regular file is, for the message.
const char *KindOf(mode_t mode) {
    if (S_ISLNK(mode))
        return "a symbolic link (name the file it points to)";
    if (S_ISDIR(mode))
        return "a directory";
    if (S_ISFIFO(mode))
        return "a FIFO, not a regular file";
    if (S_ISCHR(mode) || S_ISBLK(mode))
        return "a device, not a regular file";
    if (S_ISSOCK(mode))
        return "a socket, not a regular file";
    return "not a regular file";
}

// Root may write any file, so access() tells root nothing: a file without
// any write permission bit is one its owner made read-only, and root leaves
// it as well. Anyone else needs the write permission the mode gives them.
bool MayReplace(const std::string &path, const struct stat &info) {
    if (::geteuid() == 0)
        return (info.st_mode & (S_IWUSR | S_IWGRP | S_IWOTH)) != 0;
    return ::faccessat(AT_FDCWD, path.c_str(), W_OK, AT_EACCESS) == 0;
}

[[noreturn]] void Refuse(const std::string &target, const std::string &why) {
    throw std::runtime_error("cannot write " + target + ": " + why);
}

} // namespace

std::vector<DatasetFile> DatasetFiles(const host::Raster &raster) {
    std::vector<DatasetFile> files;
    const std::string description = FilePartOf(raster.Name());
    AddIfPresent(description, files);
    const std::string folder =
        description.substr(0, description.rfind('/') + 1);
    AddIfPresent(folder + "ProductDescription.self", files);
    // The driver's lists name the tables by their usual names only.
    for (const LookupTableName &table : LookupTableNames(raster))
        AddIfPresent(folder + table.fileName, files);
    const host::FileLists lists = raster.Files();
    for (const std::string &path : lists.images)
        AddIfPresent(path, files);
    AddIfPresent(lists.browse, files);
    for (const std::string &path : lists.auxiliary)
        AddIfPresent(path, files);
    return files;
}

void RequireReplaceableTarget(const std::string &target,
                              const std::vector<DatasetFile> &datasetFiles) {
    struct stat info {};
    if (::lstat(target.c_str(), &info) != 0) {
        if (errno == ENOENT)
            return;
        Refuse(target, std::strerror(errno));
    }
    if (!S_ISREG(info.st_mode))
        Refuse(target, std::string("it is ") + KindOf(info.st_mode));
    for (const DatasetFile &file : datasetFiles)
        if (file.device == info.st_dev && file.inode == info.st_ino)
            Refuse(target, "it is the dataset's own file " + file.path);
    if (!MayReplace(target, info))
        Refuse(target, "it is read-only");
}
