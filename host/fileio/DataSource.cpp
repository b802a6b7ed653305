#include "host/fileio/DataSource.hpp"

namespace orv::core::fileio {

// Out of line so that the type information of DataSource lives in the host
// library: callers tell File and URI apart with dynamic_cast.
DataSource::~DataSource() = default;

} // namespace orv::core::fileio
