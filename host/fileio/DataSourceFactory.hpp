#pragma once

#include "host/Visibility.hpp"

#include "host/fileio/DataSource.hpp"

#include <memory>
#include <string>

namespace orv::core::fileio {

/// Tells dataset names apart: a name that starts with "scheme://" or holds a
/// '?' is a URI, anything else a File.
class VXB_API DataSourceFactory {
  public:
    static DataSourceFactory *GetInstance();
    /// The data source of name; throws orv::Exception for a name that looks
    /// like a URI but does not parse as one.
    std::unique_ptr<DataSource> Create(const std::string &name) const;
    static bool LooksLikeURI(const std::string &name);
};

} // namespace orv::core::fileio
