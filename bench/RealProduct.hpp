#pragma once

#include <cstdlib>
#include <string>

// The real product the benchmarks measure: the folder in RS2_BENCH_PRODUCT
// when set, else the shared data folder beside the source tree.
inline std::string RealProductFolder() {
    const char *chosen = std::getenv("RS2_BENCH_PRODUCT");
    return chosen != nullptr ? chosen
                             : RS2_SOURCE_DIR
               "/../shared/realdata/rs2_slc_f0w2_hh_20170430";
}
