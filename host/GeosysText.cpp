#include "host/ProjectionServices.hpp"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <sstream>
#include <string>
#include <vector>

namespace {

std::vector<std::string> UpperWords(const char *text) {
    std::string upper(text);
    std::transform(upper.begin(), upper.end(), upper.begin(),
                   [](unsigned char c) { return std::toupper(c); });
    std::istringstream stream(upper);
    std::vector<std::string> words;
    for (std::string word; stream >> word;)
        words.push_back(word);
    return words;
}

// The only datum the host knows is WGS84, written D000.
bool IsWgs84Datum(const std::string &word) {
    return word == "D000" || word == "D0" || word == "WGS84" ||
           word == "E000" || word == "E0";
}

bool IsUtmBand(char letter) {
    return letter >= 'C' && letter <= 'X' && letter != 'I' && letter != 'O';
}

struct Decoded {
    int32_t code = kGeosysUnknown;
    std::string text;
};

Decoded DecodeUtm(const std::vector<std::string> &words) {
    if (words.size() < 2 || words.size() > 4)
        return {};
    char *end = nullptr;
    long zone = std::strtol(words[1].c_str(), &end, 10);
    if (*end != '\0' || zone < 1 || zone > 60)
        return {};
    char band = 'N';
    size_t next = 2;
    if (next < words.size() && words[next].size() == 1) {
        band = words[next][0];
        if (!IsUtmBand(band))
            return {};
        ++next;
    }
    if (next < words.size() && !IsWgs84Datum(words[next++]))
        return {};
    if (next != words.size())
        return {};
    char text[kGeosysTextSize];
    std::snprintf(text, sizeof text, "UTM %ld %c D000", zone, band);
    return {kGeosysUTM, text};
}

Decoded DecodeWords(const std::vector<std::string> &words) {
    if (words.empty())
        return {};
    const std::string &kind = words[0];
    bool datumOnly =
        words.size() == 1 || (words.size() == 2 && IsWgs84Datum(words[1]));
    if ((kind == "LONG" || kind == "LON") && datumOnly)
        return {kGeosysLong, "LONG D000"};
    if (kind == "PIXEL" && words.size() == 1)
        return {kGeosysPixel, "PIXEL"};
    if ((kind == "METER" || kind == "METRE") && words.size() == 1)
        return {kGeosysMeter, "METER"};
    if (kind == "UTM")
        return DecodeUtm(words);
    return {};
}

} // namespace

int32_t InitProjInfo(ProjInfo_t *record, int32_t) {
    if (record == nullptr)
        return kGeosysUnknown;
    std::memset(record, 0, sizeof *record);
    std::strcpy(record->geosys, "PIXEL");
    record->transform[1] = 1.0;
    record->transform[5] = 1.0;
    return 0;
}

int32_t DecodeGeosys(const char *text, char *out) {
    Decoded decoded;
    if (text != nullptr)
        decoded = DecodeWords(UpperWords(text));
    if (out != nullptr) {
        // An unknown text is handed back as given, cut to the text size.
        std::string written = decoded.code != kGeosysUnknown
                                  ? decoded.text
                                  : std::string(text ? text : "");
        std::strncpy(out, written.c_str(), kGeosysTextSize - 1);
        out[kGeosysTextSize - 1] = '\0';
    }
    return decoded.code;
}

int32_t RequiresProjInfo(int32_t code) { return code == kGeosysUTM ? 1 : 0; }
