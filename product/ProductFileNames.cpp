// The file names of product.xml are data of the product, not paths to be
// trusted: a product received from elsewhere must not make the driver read
// a file beside or above its folder (another product's image, a system file)
// under the name of one of its own.

#include "product/ProductFileNames.hpp"

#include "host/ErrorReports.hpp"
#include "host/TextServices.hpp"

#include <string_view>

namespace {

constexpr int32_t kWarningCode = -1;

} // namespace

bool IsNameInsideProduct(const char *name) {
    if (name == nullptr)
        return true;
    const std::string_view text(name);
    if (!text.empty() && text.front() == '/')
        return false;
    std::size_t start = 0;
    for (;;) {
        const std::size_t slash = text.find('/', start);
        if (text.substr(start, slash - start) == "..")
            return false;
        if (slash == std::string_view::npos)
            return true;
        start = slash + 1;
    }
}

void WarnNameOutsideProduct(const char *name) {
    IMPError(kWarningCode, host::kWarning,
             _("The file name %s in product.xml leads out of the product "
               "folder; the file is not read."),
             name != nullptr ? name : "");
}
