#pragma once

#include "host/Visibility.hpp"

#include "host/fileio/DataSource.hpp"
#include "host/fileio/QueryComponents.hpp"

#include <memory>
#include <string>

namespace orv::core::fileio {

/// An RFC 3986 reference: an absolute URI ("file:///data/product.xml?c=sigma")
/// or a scheme-less one ("product.xml?c=sigma"). Parsing and writing, with
/// percent-encoding, are uriparser's; the query is kept decoded as pairs
/// ('+' in the query reads as a space) and written back with spaces as %20.
/// Bytes that may never appear in a URI (spaces, control bytes, non-ASCII
/// bytes and "<>\^`{|}) are read as their percent-encoding, so that typed
/// names and file paths holding them parse.
class VXB_API URI : public DataSource {
  public:
    /// Parses text; throws orv::Exception when it is not a valid reference.
    explicit URI(const std::string &text);
    /// The same reference with its query replaced by query.
    URI(const URI &base, const QueryComponents &query);
    ~URI() override;

    std::string ToString() const override;
    /// The scheme in lower case, empty for a scheme-less reference.
    const std::string &Scheme() const { return scheme; }
    /// The authority as written (user, host, port), still encoded; empty when
    /// there is none or it is empty ("file:///data").
    const std::string &Authority() const { return authority; }
    /// The path, percent-decoded.
    std::string DecodedPath() const;
    const QueryComponents &GetQueryComponents() const { return query; }
    /// A new URI with query in place of this one's.
    std::unique_ptr<URI> SetQueryComponents(const QueryComponents &q) const;
    /// The value of the first query pair of key, empty when there is none.
    std::string GetFirstValue(const std::string &key) const;

  private:
    URI() = default;
    std::string scheme;
    std::string authority;   // as written, still encoded; "" for local files
    std::string encodedPath; // as written, percent-encoded
    bool hasAuthority = false;
    QueryComponents query;
    std::string fragment; // still encoded
};

} // namespace orv::core::fileio
