#pragma once

#include <string_view>

/// Reads one float from text as formatted stream input (operator>> of an
/// istream in the classic locale) does: leading white space is skipped, the
/// characters after the number are ignored, and a text that holds no number
/// ("abc", "inf", "1e") or whose number is beyond the float range gives
/// false and leaves value as it was.
bool ReadFloatLikeStream(std::string_view text, float *value);
