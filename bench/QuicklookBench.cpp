// `rs2 quicklook` of the real 18465 x 30466 SLC product against a full read
// of it: opening the product and reading every row, uncalibrated, in bands
// of 64 rows through Raster::ReadReal32Into, as a program that wanted the
// whole image would. The quicklook runs as a child process, as a user runs
// it, so its time includes starting the tool and loading the product; the
// full read runs in this process and includes loading the product too.
// Loading is a fixed cost the preview cannot shrink, so two more series
// measure it: opening the product alone, and a quicklook of one pixel
// (--max-size 1); the preview's own work is the difference.
//
// Prints median wall and CPU times, the ratios, and the quicklooks' peak
// resident set (getrusage of the children, which counts the pages of
// memory-mapped input files). Targets: quicklook / full read below 1/20,
// the peak below 64 MiB.
//
//   quicklook_bench [--repetitions N]
//
// The product is the real one (bench/RealProduct.hpp); without it the
// benchmark says so and does nothing. Arguments of Google Benchmark's form
// (--benchmark_...) are ignored, so that bench/run can pass them to every
// benchmark.

#include "bench/RealProduct.hpp"
#include "host/Raster.hpp"
#include "host/RasterServices.hpp"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <sys/resource.h>
#include <utility>
#include <vector>

namespace {

namespace fs = std::filesystem;

constexpr int32_t kBandRows = 64; // rows per call of the full read

int Repetitions(int argc, char **argv) {
    for (int i = 1; i + 1 < argc; ++i)
        if (std::strcmp(argv[i], "--repetitions") == 0)
            return std::max(1, std::atoi(argv[i + 1]));
    return 3;
}

double SecondsSince(std::chrono::steady_clock::time_point start) {
    return std::chrono::duration<double>(std::chrono::steady_clock::now() -
                                         start)
        .count();
}

double Median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    const size_t n = values.size();
    return n % 2 ? values[n / 2] : 0.5 * (values[n / 2 - 1] + values[n / 2]);
}

double CpuSeconds(int who) {
    rusage usage{};
    getrusage(who, &usage);
    return usage.ru_utime.tv_sec + usage.ru_stime.tv_sec +
           1e-6 * (usage.ru_utime.tv_usec + usage.ru_stime.tv_usec);
}

// Median wall and CPU seconds of a series of runs.
struct Series {
    std::vector<double> wall, cpu;

    template <typename Run> void Measure(int who, Run &&run) {
        const auto start = std::chrono::steady_clock::now();
        const double cpuStart = CpuSeconds(who);
        run();
        wall.push_back(SecondsSince(start));
        cpu.push_back(CpuSeconds(who) - cpuStart);
    }
    double Wall() const { return Median(wall); }
    double Cpu() const { return Median(cpu); }
};

// Opens the product and reads all its rows.
void FullRead(const std::string &name) {
    const host::Raster raster = host::OpenRaster(name);
    const int32_t type = raster.ChannelType(1);
    const size_t valuesPerSample =
        type == kChanComplexInt16 || type == kChanComplexFloat32 ? 2 : 1;
    std::vector<float> band(static_cast<size_t>(raster.Width()) * kBandRows *
                            valuesPerSample);
    for (int32_t row = 0; row < raster.Height(); row += kBandRows) {
        const int32_t rows = std::min(kBandRows, raster.Height() - row);
        raster.ReadReal32Into({0, row, raster.Width(), rows}, raster.Width(),
                              rows, {1}, band.data(), band.size());
    }
}

// Runs the quicklook as a child with the extra arguments; throws when it
// fails.
void Quicklook(const fs::path &product, const std::string &arguments) {
    const fs::path output =
        fs::temp_directory_path() / "rs2_quicklook_bench.png";
    const std::string command = std::string("'") + RS2_TOOL + "' quicklook '" +
                                product.string() + "' '" + output.string() +
                                "' " + arguments + " >/dev/null";
    const int status = std::system(command.c_str());
    fs::remove(output);
    if (status != 0)
        throw std::runtime_error("rs2 quicklook failed");
}

// The largest resident set of any child waited for, in MiB.
double ChildrenPeakMiB() {
    rusage usage{};
    getrusage(RUSAGE_CHILDREN, &usage);
    return usage.ru_maxrss / 1024.0;
}

} // namespace

int main(int argc, char **argv) {
    const fs::path product = RealProductFolder();
    if (!fs::exists(product / "product.xml")) {
        std::printf("quicklook_bench: no product at %s (set "
                    "RS2_BENCH_PRODUCT); nothing measured\n",
                    product.c_str());
        return 0;
    }
    try {
        const int repetitions = Repetitions(argc, argv);
        const std::string name = product.string();
        Quicklook(product, ""); // the image into the page cache
        Series full, open, quick, onePixel;
        for (int i = 0; i < repetitions; ++i) {
            full.Measure(RUSAGE_SELF, [&] { FullRead(name); });
            open.Measure(RUSAGE_SELF, [&] { host::OpenRaster(name); });
            quick.Measure(RUSAGE_CHILDREN, [&] { Quicklook(product, ""); });
            onePixel.Measure(RUSAGE_CHILDREN,
                             [&] { Quicklook(product, "--max-size 1"); });
        }
        const double ratio = quick.Wall() / full.Wall();
        const double peak = ChildrenPeakMiB();
        std::printf("product: %s\n", product.c_str());
        std::printf("medians over %d runs            wall s    CPU s\n",
                    repetitions);
        const std::pair<const char *, const Series *> rows[] = {
            {"full read (64-row bands)", &full},
            {"  of which opening", &open},
            {"rs2 quicklook", &quick},
            {"rs2 quicklook --max-size 1", &onePixel}};
        for (const auto &[label, series] : rows)
            std::printf("%-30s %8.3f %8.3f\n", label, series->Wall(),
                        series->Cpu());
        std::printf("quicklook peak RSS: %.1f MiB\n", peak);
        std::printf("ratio quicklook / full read: %.4f wall (1/%.0f), %.4f "
                    "CPU\n",
                    ratio, 1.0 / ratio, quick.Cpu() / full.Cpu());
        std::printf("ratio without loading ((quicklook - one pixel) / (full "
                    "read - opening)): %.4f wall, %.4f CPU\n",
                    (quick.Wall() - onePixel.Wall()) /
                        (full.Wall() - open.Wall()),
                    (quick.Cpu() - onePixel.Cpu()) / (full.Cpu() - open.Cpu()));
        std::printf("targets (wall ratio below 1/20, peak below 64 MiB): %s\n",
                    ratio < 0.05 && peak < 64.0 ? "met" : "MISSED");
        return 0;
    } catch (const std::exception &error) {
        std::fprintf(stderr, "quicklook_bench: %s\n", error.what());
        return 1;
    }
}
