#pragma once

#include "host/Visibility.hpp"

#include "host/fileio/DataSource.hpp"

#include <memory>
#include <string>

namespace orv::core::fileio {

class URI;

/// A file name, optionally followed by extended information: everything from
/// the first ':' after the last '/' ("dir/product.xml:Calibration Type:Beta").
/// Operations that change a name return a new File and leave this one as is.
class VXB_API File : public DataSource {
  public:
    /// The name as given.
    explicit File(const std::string &name);
    /// The file a URI designates: a file URI or a scheme-less reference.
    /// Throws orv::Exception for any other scheme.
    explicit File(const URI &uri);
    ~File() override;

    /// A new File for name, or null when name is empty.
    static std::unique_ptr<File> Create(const std::string &name);

    /// The name as given, extended information included.
    std::string ToString() const override;
    /// The name without its extended information.
    const std::string &GetFileName() const { return fileName; }
    /// The extended information with its leading ':', or empty.
    const std::string &GetExtendedInfo() const { return extendedInfo; }
    /// The directory with its trailing '/'; empty for a bare name.
    std::string GetPath() const;
    /// The absolute, lexically normalised path, without extended information.
    std::string GetNormalizedName() const;
    /// "file://" URI of the normalised name (percent-encoded).
    std::unique_ptr<URI> ToURI() const;

    std::unique_ptr<File> SetExtendedInfo(const std::string &info) const;
    /// The same directory and extension with another base name.
    std::unique_ptr<File> SetBasename(const std::string &basename) const;
    /// The same directory and base name with another extension (no dot).
    std::unique_ptr<File> SetExtension(const std::string &extension) const;

  private:
    File(const std::string &fileNameIn, const std::string &extendedInfoIn);
    std::string fileName;
    std::string extendedInfo;
};

} // namespace orv::core::fileio
