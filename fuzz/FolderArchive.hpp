#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace rs2fuzz {

/// Unpacks a fuzz input into a product folder: the folder's own name and
/// every file in it come from the input, so names with any bytes, side files,
/// tables, images and symbolic links all meet the reader together.
///
/// The input is text-like, so that mutations keep its shape:
///
///     FOLDER NAME
///     @@ FILE NAME
///     the file's bytes, up to the next line that starts with "@@"
///     @@> LINK NAME
///     where the link points
///
/// Names are single path components: '/' becomes '_', and "", "." and ".."
/// are skipped, so nothing is written outside root. Link targets are taken
/// as they are, which is the point: the reader must not follow them out of
/// the folder. Gives the product folder's path inside root, which is
/// emptied first.
std::string UnpackProductFolder(const std::string &root, const uint8_t *data,
                                size_t size);

} // namespace rs2fuzz
