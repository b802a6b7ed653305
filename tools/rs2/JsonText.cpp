#include "tools/rs2/JsonText.hpp"

namespace {

// Length of the valid UTF-8 sequence at text[at], 0 when there is none:
// overlong forms, surrogates and code points beyond U+10FFFF are invalid.
size_t SequenceLength(std::string_view text, size_t at) {
    const auto byte = [&](size_t i) {
        return static_cast<unsigned char>(text[at + i]);
    };
    const unsigned char lead = byte(0);
    if (lead < 0x80)
        return 1;
    size_t length = 0;
    unsigned char low = 0x80, high = 0xBF; // range of the second byte
    if (lead >= 0xC2 && lead <= 0xDF) {
        length = 2;
    } else if (lead >= 0xE0 && lead <= 0xEF) {
        length = 3;
        low = lead == 0xE0 ? 0xA0 : 0x80;
        high = lead == 0xED ? 0x9F : 0xBF;
    } else if (lead >= 0xF0 && lead <= 0xF4) {
        length = 4;
        low = lead == 0xF0 ? 0x90 : 0x80;
        high = lead == 0xF4 ? 0x8F : 0xBF;
    } else {
        return 0;
    }
    if (text.size() - at < length || byte(1) < low || byte(1) > high)
        return 0;
    for (size_t i = 2; i < length; ++i)
        if (byte(i) < 0x80 || byte(i) > 0xBF)
            return 0;
    return length;
}

void MakeStringsValid(nlohmann::json &value) {
    if (value.is_string()) {
        value = ValidUtf8(value.get_ref<const std::string &>());
    } else if (value.is_structured()) {
        for (nlohmann::json &item : value)
            MakeStringsValid(item);
    }
}

} // namespace

std::string ValidUtf8(std::string_view text) {
    std::string valid;
    valid.reserve(text.size());
    for (size_t at = 0; at < text.size();) {
        const size_t length = SequenceLength(text, at);
        if (length > 0) {
            valid.append(text.substr(at, length));
            at += length;
            continue;
        }
        const auto latin1 = static_cast<unsigned char>(text[at++]);
        valid += static_cast<char>(0xC0 | (latin1 >> 6));
        valid += static_cast<char>(0x80 | (latin1 & 0x3F));
    }
    return valid;
}

std::string JsonText(nlohmann::json value, int indent) {
    MakeStringsValid(value);
    return value.dump(indent);
}
