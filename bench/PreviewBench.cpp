// Decimated previews against a full read of a calibrated (Sigma Nought)
// 4000 x 6000 quad-polarization SLC product, through host::Raster as a
// program reads it. See README.md for what the figures must show.
//
// peak_growth_MiB is how far the resident set rose above where it stood
// when the read began (the kernel's peak is reset first): the output
// buffer plus whatever scratch the host and the driver took. Each benchmark
// makes its read once before measuring, so that the pages of the
// memory-mapped image files it touches are mapped already and do not count;
// large blocks are mapped and unmapped by the allocator on every read, so a
// read cannot hide its memory in blocks an earlier one left behind.

#include "bench/KeptProducts.hpp"
#include "host/Raster.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <benchmark/benchmark.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <malloc.h>
#include <numeric>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

constexpr int32_t kWidth = 4000;
constexpr int32_t kHeight = 6000;
constexpr int32_t kBandRows = 64;   // rows per call of the full read
constexpr int32_t kDecimation = 16; // per side
const std::vector<int32_t> kChannels = {1, 2, 3, 4};

// The product folder ($RS2_BENCH_DIR, default $TMPDIR/rs2_bench), generated
// when missing and kept for later runs.
std::string ProductName() {
    rs2gen::ProductOptions options;
    options.productType = "SLC";
    options.polarizations = {"HH", "HV", "VH", "VV"};
    options.width = kWidth;
    options.height = kHeight;
    return (KeptProduct("slc_4000x6000_quad", options) / "product.xml")
               .string() +
           "?c=sigma";
}

const host::Raster &Dataset() {
    static const host::Raster raster = host::OpenRaster(ProductName());
    return raster;
}

long StatusKiB(const char *field) {
    std::ifstream status("/proc/self/status");
    std::string line;
    while (std::getline(status, line))
        if (line.rfind(field, 0) == 0)
            return std::atol(line.c_str() + std::string(field).size());
    return 0;
}

// Runs read once and returns how far the resident set rose, in MiB.
template <typename Read> double PeakGrowthMiB(Read &&read) {
    std::ofstream("/proc/self/clear_refs") << "5"; // reset the peak
    const long before = StatusKiB("VmRSS:");
    read();
    return (StatusKiB("VmHWM:") - before) / 1024.0;
}

void FullRead(const host::Raster &raster) {
    for (int32_t row = 0; row < kHeight; row += kBandRows) {
        const int32_t rows = std::min(kBandRows, kHeight - row);
        benchmark::DoNotOptimize(
            raster.ReadReal32({0, row, kWidth, rows}, kWidth, rows, kChannels));
    }
}

void BM_FullRead(benchmark::State &state) {
    const host::Raster &raster = Dataset();
    FullRead(raster);
    double growth = 0.0;
    for (auto _ : state)
        growth = PeakGrowthMiB([&] { FullRead(raster); });
    state.counters["peak_growth_MiB"] = growth;
    state.counters["output_MiB"] = 0.0;
}
BENCHMARK(BM_FullRead)->Unit(benchmark::kMillisecond);

// A window of width x (1.5 width) at the image's upper-left corner, read to
// 1/16 of its size in each direction.
void BM_Preview16(benchmark::State &state) {
    const host::Raster &raster = Dataset();
    const auto width = static_cast<int32_t>(state.range(0));
    const int32_t height = width * kHeight / kWidth;
    const int32_t bufferWidth = width / kDecimation;
    const int32_t bufferHeight = height / kDecimation;
    double growth = 0.0;
    for (auto _ : state)
        growth = PeakGrowthMiB([&] {
            benchmark::DoNotOptimize(raster.ReadReal32(
                {0, 0, width, height}, bufferWidth, bufferHeight, kChannels));
        });
    state.counters["peak_growth_MiB"] = growth;
    state.counters["output_MiB"] = bufferWidth * bufferHeight *
                                   kChannels.size() * 2 * sizeof(float) /
                                   1048576.0;
}
BENCHMARK(BM_Preview16)
    ->Arg(kWidth)
    ->Arg(kWidth / 2)
    ->Arg(kWidth / 4)
    ->Unit(benchmark::kMillisecond);

// The whole image to one fixed preview size: only the decimation grows
// with the window, not the memory.
void BM_PreviewFixedOutput(benchmark::State &state) {
    const host::Raster &raster = Dataset();
    const auto width = static_cast<int32_t>(state.range(0));
    const int32_t height = width * kHeight / kWidth;
    double growth = 0.0;
    for (auto _ : state)
        growth = PeakGrowthMiB([&] {
            benchmark::DoNotOptimize(
                raster.ReadReal32({0, 0, width, height}, 250, 375, kChannels));
        });
    state.counters["peak_growth_MiB"] = growth;
    state.counters["output_MiB"] =
        250 * 375 * kChannels.size() * 2 * sizeof(float) / 1048576.0;
}
BENCHMARK(BM_PreviewFixedOutput)
    ->Arg(kWidth)
    ->Arg(kWidth / 2)
    ->Arg(kWidth / 4)
    ->Unit(benchmark::kMillisecond);

} // namespace

int main(int argc, char **argv) {
    // Blocks of 64 KiB and more are mapped for each allocation and unmapped
    // when freed, so that every read's memory shows in its own peak.
    mallopt(M_MMAP_THRESHOLD, 64 << 10);
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    return 0;
}
