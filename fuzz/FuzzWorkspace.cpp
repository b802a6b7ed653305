#include "fuzz/FuzzWorkspace.hpp"

#include <cstdio>
#include <fstream>
#include <map>
#include <memory>
#include <stdexcept>

namespace rs2fuzz {

Workspace &Workspace::Of(const std::string &target,
                         const std::string &productType) {
    static std::map<std::string, std::unique_ptr<Workspace>> workspaces;
    std::unique_ptr<Workspace> &workspace =
        workspaces[target + "/" + productType];
    if (!workspace)
        workspace.reset(new Workspace(productType));
    return *workspace;
}

rs2gen::ProductOptions Workspace::ProductOptions(const std::string &type) {
    rs2gen::ProductOptions options;
    options.productType = type;
    options.polarizations = {"HH", "HV"};
    options.width = 8;
    options.height = 6;
    options.tieGridColumns = 2;
    options.tieGridRows = 2;
    options.sideFile = true;
    return options;
}

Workspace::Workspace(const std::string &productType)
    : product(
          rs2gen::GenerateProduct(dir.Path(), ProductOptions(productType))) {}

std::string Workspace::Write(const std::string &name, const uint8_t *data,
                             size_t size) const {
    const std::string path = File(name);
    // A new file rather than the old one cut to nothing: a file system may
    // flush a file truncated and written again to disk when it is closed,
    // which would make every input wait for the disk.
    std::remove(path.c_str());
    std::ofstream out(path, std::ios::binary);
    out.write(reinterpret_cast<const char *>(data),
              static_cast<std::streamsize>(size));
    if (!out)
        throw std::runtime_error("cannot write " + path);
    return path;
}

} // namespace rs2fuzz
