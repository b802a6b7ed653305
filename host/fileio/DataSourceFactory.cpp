#include "host/fileio/DataSourceFactory.hpp"

#include "host/fileio/File.hpp"
#include "host/fileio/URI.hpp"

namespace orv::core::fileio {

namespace {

bool IsAsciiLetter(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool IsSchemeCharacter(char c) {
    return IsAsciiLetter(c) || (c >= '0' && c <= '9') || c == '+' || c == '-' ||
           c == '.';
}

// scheme = ALPHA *( ALPHA / DIGIT / "+" / "-" / "." ), then "://".
bool StartsWithSchemeAndAuthority(const std::string &name) {
    if (name.empty() || !IsAsciiLetter(name.front()))
        return false;
    std::string::size_type end = 1;
    while (end < name.size() && IsSchemeCharacter(name[end]))
        ++end;
    return name.compare(end, 3, "://") == 0;
}

} // namespace

DataSourceFactory *DataSourceFactory::GetInstance() {
    static DataSourceFactory instance;
    return &instance;
}

std::unique_ptr<DataSource>
DataSourceFactory::Create(const std::string &name) const {
    if (LooksLikeURI(name))
        return std::make_unique<URI>(name);
    return std::make_unique<File>(name);
}

bool DataSourceFactory::LooksLikeURI(const std::string &name) {
    // A file name never needs a '?', while a query is how a dataset name
    // carries its options.
    return name.find('?') != std::string::npos ||
           StartsWithSchemeAndAuthority(name);
}

} // namespace orv::core::fileio
