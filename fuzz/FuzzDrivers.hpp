#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

// The fuzz targets: how each one drives the reader with one input. The
// libFuzzer entry points and the regression test that replays stored
// findings both run inputs through these, so a finding is replayed through
// exactly the path that found it.

namespace rs2fuzz {

/// How one input ended: accepted by the code under test, or turned away
/// with the error it reported. A crash, a hang, a leak or an exception of
/// any other kind is a finding.
struct Outcome {
    bool accepted = false;
    std::string error; ///< the first error reported, "" when accepted
};

using Driver = Outcome (*)(const uint8_t *data, size_t size);

struct Target {
    const char *name; ///< also the folder of its seeds and stored findings
    Driver run;
};

/// The target of that name; null when there is none.
const Target *FindTarget(const std::string &name);

} // namespace rs2fuzz
