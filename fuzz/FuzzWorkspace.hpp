#pragma once

#include "host/XmlUtil.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <cstddef>
#include <cstdint>
#include <string>

namespace rs2fuzz {

/// A small generated product in a temporary folder, where a fuzz target
/// writes its inputs in place of one of the product's files. Each target has
/// its own, made on the target's first input and removed when the process
/// ends, so that a process never pays for more than one generation per
/// target and targets sharing a process never see each other's inputs.
///
/// The workspace also holds the XML platform for the life of the process:
/// initialising and terminating it around every input would cost more than
/// most inputs take to read.
class Workspace {
  public:
    /// The workspace of the target of that name, holding a product of that
    /// type (SGF: detected images, SLC: complex ones).
    static Workspace &Of(const std::string &target,
                         const std::string &productType = "SGF");

    Workspace(const Workspace &) = delete;
    Workspace &operator=(const Workspace &) = delete;

    const std::string &Folder() const { return dir.Path(); }
    /// Path of a file of the folder.
    std::string File(const std::string &name) const { return dir.File(name); }
    const std::string &ProductXml() const { return product.productXml; }
    /// Replaces (or creates) the file name with the input.
    std::string Write(const std::string &name, const uint8_t *data,
                      size_t size) const;

    /// What a workspace holds: an 8 x 6 dual-polarization product of the
    /// type with its look-up tables, rational functions, tie points and side
    /// file.
    static rs2gen::ProductOptions ProductOptions(const std::string &type);

  private:
    explicit Workspace(const std::string &productType);
    XmlPlatformHold platform;
    rs2test::TempDir dir;
    rs2gen::GeneratedProduct product;
};

} // namespace rs2fuzz
