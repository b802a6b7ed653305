#include "services/OrbitSegment.hpp"
#include "host/HostMemory.hpp"

#include "host/ErrorReports.hpp"
#include "host/RasterServices.hpp"
#include "host/TextServices.hpp"

#include <cstdlib>
#include <memory>

namespace {

using host::FreeDeleter;

constexpr int32_t kErrNoOrbit = 23;

} // namespace

void ServeOrbit(FILE *handle, const EphemerisSeg_t *orbit,
                EphemerisSeg_t *destination) {
    if (orbit == nullptr) {
        const char *name = fp2filename(handle);
        IMPError(kErrNoOrbit, host::kSevere,
                 _("No orbit information for `%s'."), name ? name : "");
        return;
    }
    if (destination == nullptr)
        return;
    // The copy's arrays pass to the destination with the record assignment;
    // only the copy's own block is released here.
    std::unique_ptr<EphemerisSeg_t, FreeDeleter> copy(
        VXBSatEphemerisDuplicate(orbit));
    if (copy != nullptr)
        *destination = *copy;
}
