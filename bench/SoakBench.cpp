// Soak test of the open / read / describe / close cycle: a program that
// opens product after product for hours must not grow. Each iteration opens
// a product through the host, reads a window of every channel, describes the
// dataset as `rs2 info --json` does (DescribeDataset) and closes it. The
// resident memory (RssAnon, VmRSS) and the open file descriptors are taken
// after a warm-up and again at the end; the targets are an RSS growth below
// 1 MiB, exactly as many descriptors at the end as after the warm-up, and
// no host handle left open. The heap in use (mallinfo2) is printed beside
// the resident set: the resident set also moves with how much freed memory
// the allocator keeps, the heap in use only with what is really held.
//
//   soak_bench [--iterations N] [--real-iterations M]
//
// N cycles (default 10000) of a generated 2000 x 1500 dual-polarization SGF
// product, kept in $RS2_BENCH_DIR (default $TMPDIR/rs2_bench) for later
// runs, then M cycles (default 500, 0 to skip) of the real product
// (RealProduct.hpp), whose every open parses a 557 KB description. Each
// series is preceded by its own warm-up of 100 cycles. Nothing holds the XML
// platform, so every open brings it up and down as it does for a program
// that opens one product at a time. Arguments of Google Benchmark's form
// (--benchmark_...) are ignored, so that bench/run can pass them. Exits 1
// when a target is missed.

#include "bench/KeptProducts.hpp"
#include "bench/RealProduct.hpp"
#include "host/Raster.hpp"
#include "host/RasterHandle.hpp"
#include "tools/generator/ProductGenerator.hpp"
#include "tools/rs2/DatasetJson.hpp"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <malloc.h>
#include <numeric>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

constexpr int kWarmUp = 100;
constexpr int kWidth = 2000;
constexpr int kHeight = 1500;
constexpr double kRssGrowthLimitMiB = 1.0;

struct Footprint {
    long anonKiB = 0; // RssAnon: the heap and other private memory
    long rssKiB = 0;  // VmRSS: the above plus mapped files and libraries
    long descriptors = 0;
    // Allocated and not yet freed (mallinfo2); the few blocks glibc keeps
    // in its per-thread cache after they are freed count as allocated.
    long heapKiB = 0;
};

long StatusKiB(const std::string &status, const char *field) {
    const size_t at = status.find(field);
    return at == std::string::npos
               ? -1
               : std::atol(status.c_str() + at + std::strlen(field));
}

long OpenDescriptors() {
    // The listing's own descriptor is counted both times alike.
    long count = 0;
    for (const auto &entry : fs::directory_iterator("/proc/self/fd")) {
        static_cast<void>(entry);
        ++count;
    }
    return count;
}

Footprint Measure() {
    std::ifstream file("/proc/self/status");
    const std::string status((std::istreambuf_iterator<char>(file)),
                             std::istreambuf_iterator<char>());
    file.close();
    const struct mallinfo2 heap = mallinfo2();
    return {StatusKiB(status, "RssAnon:"), StatusKiB(status, "VmRSS:"),
            OpenDescriptors(),
            static_cast<long>((heap.uordblks + heap.hblkhd) / 1024)};
}

// The generated product's description, written when missing or incomplete.
std::string GeneratedProduct() {
    rs2gen::ProductOptions options;
    options.productType = "SGF";
    options.polarizations = {"HH", "HV"};
    options.width = kWidth;
    options.height = kHeight;
    return (KeptProduct("sgf_2000x1500_hh_hv", options) / "product.xml")
        .string();
}

// One cycle; returns a figure of what it read so that none of it is idle.
double OpenReadDescribeClose(const std::string &name) {
    const host::Raster raster = host::OpenRaster(name);
    std::vector<int32_t> channels(raster.ChannelCount());
    std::iota(channels.begin(), channels.end(), 1);
    const int32_t side = std::min({256, raster.Width(), raster.Height()});
    const host::Window centre{(raster.Width() - side) / 2,
                              (raster.Height() - side) / 2, side, side};
    const std::vector<float> pixels =
        raster.ReadReal32(centre, side, side, channels);
    const nlohmann::json info = DescribeDataset(raster);
    return pixels[pixels.size() / 2] + static_cast<double>(info.size());
}

double MiB(long kib) { return kib / 1024.0; }

const char *Verdict(bool met) { return met ? "PASS" : "FAIL"; }

// Runs the warm-up and the measured cycles; prints the figures and returns
// whether the targets are met.
bool Soak(const char *label, const std::string &name, int iterations) {
    std::printf("== %s: %s, %d iterations after %d of warm-up\n", label,
                name.c_str(), iterations, kWarmUp);
    std::fflush(stdout);
    double sink = 0.0;
    for (int i = 0; i < kWarmUp; ++i)
        sink += OpenReadDescribeClose(name);
    const Footprint before = Measure();
    const auto start = std::chrono::steady_clock::now();
    const std::clock_t cpuStart = std::clock();
    for (int i = 0; i < iterations; ++i)
        sink += OpenReadDescribeClose(name);
    const double seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - start)
            .count();
    const double cpuSeconds =
        static_cast<double>(std::clock() - cpuStart) / CLOCKS_PER_SEC;
    const Footprint after = Measure();

    const double growthMiB = MiB(after.rssKiB - before.rssKiB);
    const bool memoryFlat = growthMiB < kRssGrowthLimitMiB;
    const bool descriptorsFlat = after.descriptors == before.descriptors;
    std::printf("%-14s %12s %12s %12s\n", "", "after warm-up", "at the end",
                "growth");
    std::printf("%-14s %12.2f %12.2f %12.2f\n", "RssAnon MiB",
                MiB(before.anonKiB), MiB(after.anonKiB),
                MiB(after.anonKiB - before.anonKiB));
    std::printf("%-14s %12.2f %12.2f %12.2f\n", "VmRSS MiB", MiB(before.rssKiB),
                MiB(after.rssKiB), growthMiB);
    std::printf("%-14s %12.2f %12.2f %12.2f\n", "heap in use MiB",
                MiB(before.heapKiB), MiB(after.heapKiB),
                MiB(after.heapKiB - before.heapKiB));
    std::printf("%-14s %12ld %12ld %12ld\n", "descriptors", before.descriptors,
                after.descriptors, after.descriptors - before.descriptors);
    std::printf("time per iteration: %.3f ms wall, %.3f ms CPU (checksum %g)\n",
                1e3 * seconds / std::max(1, iterations),
                1e3 * cpuSeconds / std::max(1, iterations), sink);
    const bool handlesClosed = host::LiveHandleCount() == 0;
    std::printf("live host handles at the end: %zu\n", host::LiveHandleCount());
    std::printf("RSS growth < %.0f MiB: %s; descriptors flat: %s; no handle "
                "left open: %s\n",
                kRssGrowthLimitMiB, Verdict(memoryFlat),
                Verdict(descriptorsFlat), Verdict(handlesClosed));
    return memoryFlat && descriptorsFlat && handlesClosed;
}

int IntegerOption(int argc, char **argv, const char *option, int fallback) {
    for (int i = 1; i + 1 < argc; ++i)
        if (std::strcmp(argv[i], option) == 0)
            return std::max(0, std::atoi(argv[i + 1]));
    return fallback;
}

} // namespace

int main(int argc, char **argv) {
    try {
        const int iterations = IntegerOption(argc, argv, "--iterations", 10000);
        const int realIterations =
            IntegerOption(argc, argv, "--real-iterations", 500);
        bool passed = Soak("generated", GeneratedProduct(), iterations);
        const std::string real = RealProductFolder() + "/product.xml";
        if (realIterations > 0 && fs::exists(real))
            passed = Soak("real", real, realIterations) && passed;
        else if (realIterations > 0)
            std::printf("the real product is not there: %s\n", real.c_str());
        return passed ? 0 : 1;
    } catch (const std::exception &error) {
        std::fprintf(stderr, "soak_bench: %s\n", error.what());
        return 1;
    }
}
