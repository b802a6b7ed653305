#pragma once

#include <functional>
#include <ostream>
#include <string>

namespace rs2gen {

/// Creates or replaces a text file with what `write` puts into the stream.
/// Throws std::runtime_error naming the file when it cannot be opened or
/// written completely.
void WriteTextFile(const std::string &path,
                   const std::function<void(std::ostream &)> &write);

} // namespace rs2gen
