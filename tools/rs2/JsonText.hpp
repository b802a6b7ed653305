#pragma once

#include <nlohmann/json.hpp>

#include <string>
#include <string_view>

// JSON wants UTF-8, while product files and paths may hold text in other
// encodings (a Latin-1 side file, a file name in a legacy encoding). Rather
// than fail, such text is kept: every byte that is not part of a valid UTF-8
// sequence is read as Latin-1, the character of the same number (byte 0xE9
// becomes U+00E9). Valid UTF-8 passes unchanged.

/// text with each byte outside a valid UTF-8 sequence as its Latin-1
/// character.
std::string ValidUtf8(std::string_view text);

/// value serialised with its strings made valid UTF-8 as above; indent as
/// nlohmann::json::dump takes it (-1: one line).
std::string JsonText(nlohmann::json value, int indent = -1);
