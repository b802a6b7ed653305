#include "host/XmlUtil.hpp"

#include <mutex>

#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLException.hpp>

// XmlTranscode converts between UTF-8 and UTF-16 itself instead of through the
// parser's transcoding service: the conversion is fixed by the two encodings,
// and doing it here means a value can be built at any time, also while the XML
// platform is not initialised (static data, or after the last Terminate).
static_assert(sizeof(XMLCh) == 2, "XMLCh text is taken to be UTF-16");

namespace {

struct PlatformCounter {
    std::mutex mutex;
    int count = 0;
};

PlatformCounter &ThePlatformCounter() {
    static PlatformCounter counter;
    return counter;
}

constexpr char32_t kReplacementCharacter = 0xFFFD;

bool IsContinuationByte(unsigned char byte) { return (byte & 0xC0) == 0x80; }

bool IsSurrogate(char32_t codePoint) {
    return codePoint >= 0xD800 && codePoint <= 0xDFFF;
}

// Decodes the UTF-8 sequence at text[pos] and moves pos past it. A byte that
// does not start a well-formed sequence (bad lead or continuation, overlong
// form, surrogate, beyond U+10FFFF, cut short) decodes as U+FFFD and only
// that byte is consumed, so decoding resumes at the next byte.
char32_t DecodeUtf8(const std::string &text, std::size_t &pos) {
    auto lead = static_cast<unsigned char>(text[pos]);
    std::size_t length = 0;
    char32_t codePoint = 0;
    char32_t smallest = 0;
    if (lead < 0x80) {
        ++pos;
        return lead;
    } else if ((lead & 0xE0) == 0xC0) {
        length = 2, codePoint = lead & 0x1F, smallest = 0x80;
    } else if ((lead & 0xF0) == 0xE0) {
        length = 3, codePoint = lead & 0x0F, smallest = 0x800;
    } else if ((lead & 0xF8) == 0xF0) {
        length = 4, codePoint = lead & 0x07, smallest = 0x10000;
    } else {
        ++pos;
        return kReplacementCharacter;
    }
    if (text.size() - pos < length) {
        ++pos;
        return kReplacementCharacter;
    }
    for (std::size_t i = 1; i < length; ++i) {
        auto byte = static_cast<unsigned char>(text[pos + i]);
        if (!IsContinuationByte(byte)) {
            ++pos;
            return kReplacementCharacter;
        }
        codePoint = (codePoint << 6) | (byte & 0x3F);
    }
    if (codePoint < smallest || codePoint > 0x10FFFF ||
        IsSurrogate(codePoint)) {
        ++pos;
        return kReplacementCharacter;
    }
    pos += length;
    return codePoint;
}

void AppendUtf16(std::basic_string<XMLCh> &wide, char32_t codePoint) {
    if (codePoint < 0x10000) {
        wide.push_back(static_cast<XMLCh>(codePoint));
        return;
    }
    codePoint -= 0x10000;
    wide.push_back(static_cast<XMLCh>(0xD800 + (codePoint >> 10)));
    wide.push_back(static_cast<XMLCh>(0xDC00 + (codePoint & 0x3FF)));
}

// Decodes the UTF-16 unit at text[pos], joining a surrogate pair, and moves
// pos past it; an unpaired surrogate decodes as U+FFFD.
char32_t DecodeUtf16(const std::basic_string<XMLCh> &text, std::size_t &pos) {
    char32_t unit = text[pos++];
    if (!IsSurrogate(unit))
        return unit;
    bool isHigh = unit < 0xDC00;
    if (!isHigh || pos == text.size() || text[pos] < 0xDC00 ||
        text[pos] > 0xDFFF)
        return kReplacementCharacter;
    char32_t low = text[pos++];
    return 0x10000 + ((unit - 0xD800) << 10) + (low - 0xDC00);
}

void AppendUtf8(std::string &narrow, char32_t codePoint) {
    if (codePoint < 0x80) {
        narrow.push_back(static_cast<char>(codePoint));
    } else if (codePoint < 0x800) {
        narrow.push_back(static_cast<char>(0xC0 | (codePoint >> 6)));
        narrow.push_back(static_cast<char>(0x80 | (codePoint & 0x3F)));
    } else if (codePoint < 0x10000) {
        narrow.push_back(static_cast<char>(0xE0 | (codePoint >> 12)));
        narrow.push_back(static_cast<char>(0x80 | ((codePoint >> 6) & 0x3F)));
        narrow.push_back(static_cast<char>(0x80 | (codePoint & 0x3F)));
    } else {
        narrow.push_back(static_cast<char>(0xF0 | (codePoint >> 18)));
        narrow.push_back(static_cast<char>(0x80 | ((codePoint >> 12) & 0x3F)));
        narrow.push_back(static_cast<char>(0x80 | ((codePoint >> 6) & 0x3F)));
        narrow.push_back(static_cast<char>(0x80 | (codePoint & 0x3F)));
    }
}

std::basic_string<XMLCh> Utf8ToUtf16(const std::string &narrow) {
    std::basic_string<XMLCh> wide;
    wide.reserve(narrow.size());
    for (std::size_t pos = 0; pos < narrow.size();)
        AppendUtf16(wide, DecodeUtf8(narrow, pos));
    return wide;
}

std::string Utf16ToUtf8(const std::basic_string<XMLCh> &wide) {
    std::string narrow;
    narrow.reserve(wide.size());
    for (std::size_t pos = 0; pos < wide.size();)
        AppendUtf8(narrow, DecodeUtf16(wide, pos));
    return narrow;
}

enum class WideForm { None, Utf16, Utf32 };

struct WideEncoding {
    WideForm form = WideForm::None;
    bool bigEndian = false;
    std::size_t markBytes = 0; // length of the byte-order mark
};

bool StartsWith(const std::string &bytes, const char *prefix,
                std::size_t length) {
    return bytes.size() >= length &&
           bytes.compare(0, length, prefix, length) == 0;
}

// The byte-order marks, then what an XML document without one starts with
// ('<' of its declaration or root, in every wide form). The UTF-32
// little-endian mark begins with the UTF-16 one, so it is tried first.
WideEncoding DetectWideEncoding(const std::string &bytes) {
    struct Signature {
        const char *bytes;
        std::size_t length;
        WideEncoding encoding;
    };
    static const Signature kSignatures[] = {
        {"\xFF\xFE\0\0", 4, {WideForm::Utf32, false, 4}},
        {"\0\0\xFE\xFF", 4, {WideForm::Utf32, true, 4}},
        {"\xFF\xFE", 2, {WideForm::Utf16, false, 2}},
        {"\xFE\xFF", 2, {WideForm::Utf16, true, 2}},
        {"<\0\0\0", 4, {WideForm::Utf32, false, 0}},
        {"\0\0\0<", 4, {WideForm::Utf32, true, 0}},
        {"<\0", 2, {WideForm::Utf16, false, 0}},
        {"\0<", 2, {WideForm::Utf16, true, 0}},
    };
    for (const Signature &signature : kSignatures)
        if (StartsWith(bytes, signature.bytes, signature.length))
            return signature.encoding;
    return {};
}

// The code unit of width bytes at pos.
char32_t CodeUnit(const std::string &bytes, std::size_t pos, std::size_t width,
                  bool bigEndian) {
    char32_t unit = 0;
    for (std::size_t i = 0; i < width; ++i) {
        const auto byte = static_cast<unsigned char>(
            bytes[pos + (bigEndian ? i : width - 1 - i)]);
        unit = (unit << 8) | byte;
    }
    return unit;
}

std::string WideToUtf8(const std::string &bytes, const WideEncoding &encoding) {
    const std::size_t width = encoding.form == WideForm::Utf32 ? 4 : 2;
    std::string narrow;
    narrow.reserve(bytes.size() / width);
    if (encoding.form == WideForm::Utf16) {
        std::basic_string<XMLCh> units;
        units.reserve(bytes.size() / 2);
        for (std::size_t pos = encoding.markBytes; pos + 2 <= bytes.size();
             pos += 2)
            units.push_back(static_cast<XMLCh>(
                CodeUnit(bytes, pos, 2, encoding.bigEndian)));
        narrow = Utf16ToUtf8(units);
    } else {
        for (std::size_t pos = encoding.markBytes; pos + 4 <= bytes.size();
             pos += 4) {
            const char32_t codePoint =
                CodeUnit(bytes, pos, 4, encoding.bigEndian);
            AppendUtf8(narrow, codePoint > 0x10FFFF || IsSurrogate(codePoint)
                                   ? kReplacementCharacter
                                   : codePoint);
        }
    }
    // A last unit cut short.
    if ((bytes.size() - encoding.markBytes) % width != 0)
        AppendUtf8(narrow, kReplacementCharacter);
    return narrow;
}

} // namespace

std::string TextAsUtf8(std::string bytes) {
    const WideEncoding encoding = DetectWideEncoding(bytes);
    if (encoding.form == WideForm::None)
        return bytes;
    return WideToUtf8(bytes, encoding);
}

int ORV_XMLUtil::Initialize() {
    PlatformCounter &counter = ThePlatformCounter();
    std::lock_guard<std::mutex> lock(counter.mutex);
    if (counter.count == 0) {
        try {
            xercesc::XMLPlatformUtils::Initialize();
        } catch (const xercesc::XMLException &) {
            return 0;
        } catch (const xercesc::OutOfMemoryException &) {
            return 0;
        }
    }
    ++counter.count;
    return 1;
}

void ORV_XMLUtil::Terminate() {
    PlatformCounter &counter = ThePlatformCounter();
    std::lock_guard<std::mutex> lock(counter.mutex);
    // A Terminate without its Initialize must not tear down a platform that
    // other pairs still rely on.
    if (counter.count == 0)
        return;
    if (--counter.count == 0)
        xercesc::XMLPlatformUtils::Terminate();
}

int ORV_XMLUtil::InitializeCount() {
    PlatformCounter &counter = ThePlatformCounter();
    std::lock_guard<std::mutex> lock(counter.mutex);
    return counter.count;
}

XmlTranscode::XmlTranscode(const char *text)
    : XmlTranscode(std::string(text != nullptr ? text : "")) {}

XmlTranscode::XmlTranscode(const std::string &text)
    : wide(Utf8ToUtf16(text)), narrow(text) {}

XmlTranscode::XmlTranscode(const XMLCh *text) {
    if (text != nullptr)
        wide = text;
    narrow = Utf16ToUtf8(wide);
}
