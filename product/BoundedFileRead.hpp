#pragma once

#include <cstddef>
#include <string>

/// What reading a product file up to a size limit gave.
enum class FileReadStatus {
    Read,       // bytes holds the whole file
    Unreadable, // no regular file at the path, or reading it failed
    TooLarge,   // the file holds more than the limit; nothing was read
};

struct FileBytes {
    FileReadStatus status = FileReadStatus::Unreadable;
    std::string bytes;
};

/// The whole content of the regular file at path (its name taken as the
/// bytes it is, whatever their encoding), as long as it holds at most
/// maxBytes. A larger file is not read: neither its declared size nor the
/// bytes it actually yields may pass the limit, so the memory spent is never
/// more than maxBytes, also for a sparse file or one that grows while it is
/// read. A pipe or a device named like a product file is unreadable, never
/// waited on.
FileBytes ReadFileUpTo(const char *path, std::size_t maxBytes);

/// "N MiB" (or "N bytes" below one MiB), for messages about limits.
std::string SizeText(std::size_t bytes);
