// The libFuzzer entry point of one fuzz target; the build names the target
// (RS2_FUZZ_TARGET), and every target's executable is built from this file.

#include "fuzz/FuzzDrivers.hpp"

#include <cstdio>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size);

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    static const rs2fuzz::Target *target = [] {
        const rs2fuzz::Target *found = rs2fuzz::FindTarget(RS2_FUZZ_TARGET);
        if (found == nullptr) {
            std::fprintf(stderr, "no fuzz target %s\n", RS2_FUZZ_TARGET);
            std::abort();
        }
        return found;
    }();
    target->run(data, size);
    return 0;
}
