#pragma once

#include "host/Visibility.hpp"

#include <string>

namespace orv::core::fileio {

/// What a dataset name designates: a File or a URI.
class VXB_API DataSource {
  public:
    virtual ~DataSource();
    /// The name in its own text form.
    virtual std::string ToString() const = 0;
};

} // namespace orv::core::fileio
