#include "host/fileio/URI.hpp"

#include "host/Exception.hpp"
#include "host/TextServices.hpp"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <vector>

#include <uriparser/Uri.h>

namespace orv::core::fileio {

namespace {

[[noreturn]] void ThrowInvalid(const std::string &text) {
    throw orv::Exception("Invalid URI \"" + text + "\"", "", "", 0);
}

bool IsNeverAllowed(unsigned char byte) {
    return byte <= 0x20 || byte >= 0x7F ||
           std::strchr("\"<>\\^`{|}", byte) != nullptr;
}

// Dataset names are typed by people and built from file paths, which hold
// spaces and non-ASCII letters. Such bytes can only mean themselves, so they
// are read as their percent-encoding instead of refusing the name.
std::string EscapeNeverAllowedBytes(const std::string &text) {
    static const char hexDigits[] = "0123456789ABCDEF";
    std::string escaped;
    escaped.reserve(text.size());
    for (char c : text) {
        auto byte = static_cast<unsigned char>(c);
        if (IsNeverAllowed(byte)) {
            escaped += '%';
            escaped += hexDigits[byte >> 4];
            escaped += hexDigits[byte & 0x0F];
        } else {
            escaped += c;
        }
    }
    return escaped;
}

// Owns the parse of one text; its ranges point into that text, which must
// outlive the owner.
class ParsedReference {
  public:
    ParsedReference(const std::string &escaped, const std::string &original) {
        const char *errorPosition = nullptr;
        // A failed parse frees what it allocated itself.
        if (uriParseSingleUriExA(&uri, escaped.data(),
                                 escaped.data() + escaped.size(),
                                 &errorPosition) != URI_SUCCESS)
            ThrowInvalid(original);
    }
    ~ParsedReference() { uriFreeUriMembersA(&uri); }
    ParsedReference(const ParsedReference &) = delete;
    ParsedReference &operator=(const ParsedReference &) = delete;

    const UriUriA &Get() const { return uri; }

  private:
    UriUriA uri{};
};

struct QueryListDeleter {
    void operator()(UriQueryListA *list) const { uriFreeQueryListA(list); }
};
using OwnedQueryList = std::unique_ptr<UriQueryListA, QueryListDeleter>;

// uriparser's Malloc composers allocate with the C library's malloc.
struct CTextDeleter {
    void operator()(char *text) const { std::free(text); }
};
using OwnedCText = std::unique_ptr<char, CTextDeleter>;

// The path ends at the '?' of the query or, without one, at the '#' of the
// fragment.
const char *PathEnd(const UriUriA &uri, const char *textEnd) {
    if (uri.query.first != nullptr)
        return uri.query.first - 1;
    if (uri.fragment.first != nullptr)
        return uri.fragment.first - 1;
    return textEnd;
}

std::string RangeText(const UriTextRangeA &range) {
    return range.first != nullptr ? std::string(range.first, range.afterLast)
                                  : std::string();
}

// Pairs with an empty text between two '&' are dropped by uriparser; a key
// without '=' gets an empty value.
QueryComponents DissectQuery(const UriTextRangeA &range,
                             const std::string &original) {
    QueryComponents components;
    if (range.first == nullptr || range.first == range.afterLast)
        return components;
    UriQueryListA *list = nullptr;
    int result =
        uriDissectQueryMallocExA(&list, nullptr, range.first, range.afterLast,
                                 URI_TRUE, URI_BR_DONT_TOUCH);
    OwnedQueryList owner(list);
    if (result != URI_SUCCESS)
        ThrowInvalid(original);
    for (const UriQueryListA *item = list; item != nullptr; item = item->next)
        components.AddPair(item->key,
                           item->value != nullptr ? item->value : "");
    return components;
}

std::string ComposeQuery(const QueryComponents &components) {
    const std::vector<QueryComponents::Pair> &pairs = components.Pairs();
    std::vector<UriQueryListA> items(pairs.size());
    for (std::size_t i = 0; i < pairs.size(); ++i) {
        items[i].key = pairs[i].first.c_str();
        items[i].value = pairs[i].second.c_str();
        items[i].next = i + 1 < items.size() ? &items[i + 1] : nullptr;
    }
    char *composed = nullptr;
    int result =
        uriComposeQueryMallocExA(&composed, items.data(), URI_FALSE, URI_FALSE);
    OwnedCText owner(composed);
    if (result != URI_SUCCESS)
        throw orv::Exception("Cannot write the query of a URI", "", "", 0);
    return composed;
}

} // namespace

URI::URI(const std::string &text) {
    const std::string escaped = EscapeNeverAllowedBytes(text);
    ParsedReference parsed(escaped, text);
    const UriUriA &uri = parsed.Get();
    const char *pathEnd = PathEnd(uri, escaped.data() + escaped.size());
    const char *hierarchyStart =
        uri.scheme.first != nullptr ? uri.scheme.afterLast + 1 : escaped.data();
    // "//" right after the scheme is what introduces an authority; a path can
    // never start so. The authority cannot hold a '/', so the first one after
    // it starts the path.
    hasAuthority = pathEnd - hierarchyStart >= 2 &&
                   std::strncmp(hierarchyStart, "//", 2) == 0;
    const char *pathStart = hierarchyStart;
    if (hasAuthority) {
        pathStart = std::find(hierarchyStart + 2, pathEnd, '/');
        authority.assign(hierarchyStart + 2, pathStart);
    }
    scheme = RangeText(uri.scheme);
    LCaseString(scheme.data());
    encodedPath.assign(pathStart, pathEnd);
    query = DissectQuery(uri.query, text);
    fragment = RangeText(uri.fragment);
}

URI::URI(const URI &base, const QueryComponents &queryIn) : URI(base) {
    query = queryIn;
}

URI::~URI() = default;

std::string URI::ToString() const {
    std::string text;
    if (!scheme.empty())
        text += scheme + ":";
    if (hasAuthority)
        text += "//" + authority;
    text += encodedPath;
    if (!query.Empty())
        text += "?" + ComposeQuery(query);
    if (!fragment.empty())
        text += "#" + fragment;
    return text;
}

std::string URI::DecodedPath() const {
    std::string decoded = encodedPath;
    const char *decodedEnd =
        uriUnescapeInPlaceExA(decoded.data(), URI_FALSE, URI_BR_DONT_TOUCH);
    decoded.resize(static_cast<std::size_t>(decodedEnd - decoded.data()));
    return decoded;
}

std::unique_ptr<URI> URI::SetQueryComponents(const QueryComponents &q) const {
    return std::make_unique<URI>(*this, q);
}

std::string URI::GetFirstValue(const std::string &key) const {
    return query.GetFirstValue(key);
}

} // namespace orv::core::fileio
