#pragma once

#include "tools/generator/ProductGenerator.hpp"

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

// Benchmark products live in $RS2_BENCH_DIR (default $TMPDIR/rs2_bench),
// outside the repository, and are kept for later runs.
inline std::filesystem::path BenchFolder() {
    const char *chosen = std::getenv("RS2_BENCH_DIR");
    return chosen != nullptr
               ? std::filesystem::path(chosen)
               : std::filesystem::temp_directory_path() / "rs2_bench";
}

// The product folder `name` in BenchFolder(), generated with options when it
// is missing or incomplete.
inline std::filesystem::path
KeptProduct(const std::string &name, const rs2gen::ProductOptions &options) {
    const std::filesystem::path product = BenchFolder() / name;
    bool complete = std::filesystem::exists(product / "product.xml");
    for (const std::string &pol : options.polarizations)
        complete = complete && std::filesystem::exists(
                                   product / rs2gen::ImageFileName(pol));
    if (!complete) {
        std::printf("generating %s ...\n", product.c_str());
        std::fflush(stdout);
        rs2gen::GenerateProduct(product.string(), options);
    }
    return product;
}
