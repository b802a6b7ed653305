#pragma once

#include "host/Visibility.hpp"

#include <string>

#include <xercesc/util/XercesDefs.hpp>

/// Counted set-up of the XML platform: pairs may nest, and the platform is
/// really terminated when the last pair closes.
class VXB_API ORV_XMLUtil {
  public:
    /// 1 when the platform is ready (then call Terminate once), 0 on failure.
    static int Initialize();
    static void Terminate();
    /// Number of open Initialize calls (for diagnostics and tests).
    static int InitializeCount();
};

/// One XML platform initialisation held for the life of the object.
class XmlPlatformHold {
  public:
    XmlPlatformHold() : held(ORV_XMLUtil::Initialize() != 0) {}
    ~XmlPlatformHold() {
        if (held)
            ORV_XMLUtil::Terminate();
    }
    XmlPlatformHold(const XmlPlatformHold &) = delete;
    XmlPlatformHold &operator=(const XmlPlatformHold &) = delete;

    /// True when the platform is ready.
    bool Held() const { return held; }

  private:
    bool held;
};

/// Conversion between narrow UTF-8 text and the parser's XMLCh text.
/// Built from narrow text it yields XMLCh text; built from XMLCh text it
/// yields a std::string. An empty value yields empty texts. Malformed input
/// (bytes that are not UTF-8, unpaired surrogates) converts each bad unit to
/// U+FFFD. Needs no initialised XML platform.
class VXB_API XmlTranscode {
  public:
    XmlTranscode() = default;
    explicit XmlTranscode(const char *text);
    explicit XmlTranscode(const std::string &text);
    explicit XmlTranscode(const XMLCh *text);

    const XMLCh *XmlText() const { return wide.c_str(); }
    const std::string &Narrow() const { return narrow; }
    operator const XMLCh *() const { return XmlText(); }
    operator std::string() const { return narrow; }
    bool Empty() const { return narrow.empty(); }

  private:
    std::basic_string<XMLCh> wide;
    std::string narrow;
};

/// The text of a file in UTF-8. Text in UTF-16 or UTF-32, as a byte-order
/// mark or the first character of an XML document ('<') tells, is
/// transcoded, without its byte-order mark; malformed units become U+FFFD.
/// Any other text is returned as it is, byte for byte.
std::string TextAsUtf8(std::string bytes);
