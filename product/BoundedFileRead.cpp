#include "product/BoundedFileRead.hpp"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

// Closes a descriptor on every way out.
class Descriptor {
  public:
    explicit Descriptor(int fdIn) : fd(fdIn) {}
    ~Descriptor() {
        if (fd >= 0)
            ::close(fd);
    }
    Descriptor(const Descriptor &) = delete;
    Descriptor &operator=(const Descriptor &) = delete;
    int Get() const { return fd; }

  private:
    int fd;
};

// Reads until the end of the file or until more than maxBytes arrived;
// false on a read error.
bool ReadAll(int fd, std::size_t maxBytes, std::string &bytes) {
    constexpr std::size_t kChunk = 1 << 16;
    for (;;) {
        const std::size_t start = bytes.size();
        const std::size_t room = std::min(kChunk, maxBytes + 1 - start);
        bytes.resize(start + room);
        const ssize_t got = ::read(fd, &bytes[start], room);
        if (got < 0 && errno == EINTR) {
            bytes.resize(start);
            continue;
        }
        if (got < 0)
            return false;
        bytes.resize(start + static_cast<std::size_t>(got));
        if (got == 0 || bytes.size() > maxBytes)
            return true;
    }
}

} // namespace

FileBytes ReadFileUpTo(const char *path, std::size_t maxBytes) {
    FileBytes result;
    if (path == nullptr)
        return result;
    // Without O_NONBLOCK, opening a pipe would wait for a writer.
    Descriptor file(::open(path, O_RDONLY | O_NONBLOCK | O_CLOEXEC));
    struct stat info {};
    if (file.Get() < 0 || ::fstat(file.Get(), &info) != 0 ||
        !S_ISREG(info.st_mode))
        return result;
    if (static_cast<unsigned long long>(info.st_size) > maxBytes) {
        result.status = FileReadStatus::TooLarge;
        return result;
    }
    result.bytes.reserve(static_cast<std::size_t>(info.st_size));
    if (!ReadAll(file.Get(), maxBytes, result.bytes)) {
        result.bytes.clear();
        return result;
    }
    if (result.bytes.size() > maxBytes) {
        result.bytes = std::string();
        result.status = FileReadStatus::TooLarge;
        return result;
    }
    result.status = FileReadStatus::Read;
    return result;
}

std::string SizeText(std::size_t bytes) {
    constexpr std::size_t kMiB = 1024 * 1024;
    if (bytes >= kMiB && bytes % kMiB == 0)
        return std::to_string(bytes / kMiB) + " MiB";
    return std::to_string(bytes) + " bytes";
}
