#include "host/RasterHandle.hpp"

#include <map>

namespace host {
namespace {

// Every live handle, keyed by the address it is known by. Only addresses in
// this map are ever dereferenced, so a stale or foreign FILE* is harmless.
std::map<FILE *, std::unique_ptr<RasterHandle>> &Registry() {
    static std::map<FILE *, std::unique_ptr<RasterHandle>> registry;
    return registry;
}

} // namespace

RasterHandle *LookupHandle(FILE *fp) {
    auto found = Registry().find(fp);
    return found == Registry().end() ? nullptr : found->second.get();
}

FILE *RegisterHandle(std::unique_ptr<RasterHandle> handle) {
    FILE *fp = reinterpret_cast<FILE *>(handle.get());
    Registry()[fp] = std::move(handle);
    return fp;
}

std::unique_ptr<RasterHandle> UnregisterHandle(FILE *fp) {
    auto found = Registry().find(fp);
    if (found == Registry().end())
        return nullptr;
    std::unique_ptr<RasterHandle> handle = std::move(found->second);
    Registry().erase(found);
    return handle;
}

size_t LiveHandleCount() { return Registry().size(); }

} // namespace host
