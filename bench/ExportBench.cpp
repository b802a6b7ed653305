// `rs2 export` of Sigma Nought for an 8000 x 8000 dual-polarization SGF
// product against export_lower_bound, the least work the same export can do
// (ExportLowerBound.cpp). Both run as child processes, alternately, after
// one warm-up run each that also checks that they write the same pixels.
// Prints median wall and CPU times, their ratios, and the peak memory of
// each: the peak resident set (getrusage, which counts the pages of
// memory-mapped input files) and the peak anonymous resident memory
// (RssAnon, sampled every 2 ms: buffers, not file pages). See README.md.
//
//   export_bench [--repetitions N]
//
// The product is generated once into $RS2_BENCH_DIR (default
// $TMPDIR/rs2_bench) and kept for later runs; outputs are removed after
// each run. Arguments of Google Benchmark's form (--benchmark_...) are
// ignored, so that bench/run can pass them to every benchmark.

#include "bench/KeptProducts.hpp"
#include "tests/support/TiffPixels.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <tiffio.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/resource.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

namespace {

namespace fs = std::filesystem;

constexpr int kSize = 8000;

struct RunResult {
    double seconds = 0.0;     // wall clock
    double cpuSeconds = 0.0;  // user and system time
    double peakRssMiB = 0.0;  // ru_maxrss
    double peakAnonMiB = 0.0; // sampled RssAnon
};

// The product folder, generated when missing or incomplete.
fs::path Product() {
    rs2gen::ProductOptions options;
    options.productType = "SGF";
    options.polarizations = {"HH", "HV"};
    options.width = kSize;
    options.height = kSize;
    return KeptProduct("sgf_8000_hh_hv", options);
}

// RssAnon of a process in MiB, or 0 when it cannot be read.
double AnonymousMiB(pid_t pid) {
    std::ifstream status("/proc/" + std::to_string(pid) + "/status");
    std::string line;
    while (std::getline(status, line))
        if (line.rfind("RssAnon:", 0) == 0)
            return std::atof(line.c_str() + 8) / 1024.0;
    return 0.0;
}

RunResult Run(const std::vector<std::string> &command) {
    std::vector<char *> arguments;
    for (const std::string &argument : command)
        arguments.push_back(const_cast<char *>(argument.c_str()));
    arguments.push_back(nullptr);
    // Whatever is buffered must not be written twice, by the child too.
    std::fflush(stdout);
    const auto start = std::chrono::steady_clock::now();
    const pid_t pid = fork();
    if (pid < 0)
        throw std::runtime_error("cannot fork");
    if (pid == 0) {
        if (std::freopen("/dev/null", "w", stdout) == nullptr)
            _exit(126);
        execv(arguments[0], arguments.data());
        _exit(127);
    }
    RunResult result;
    int status = 0;
    rusage usage{};
    while (wait4(pid, &status, WNOHANG, &usage) == 0) {
        result.peakAnonMiB = std::max(result.peakAnonMiB, AnonymousMiB(pid));
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    result.seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - start)
            .count();
    result.peakRssMiB = usage.ru_maxrss / 1024.0;
    result.cpuSeconds =
        usage.ru_utime.tv_sec + usage.ru_stime.tv_sec +
        1e-6 * (usage.ru_utime.tv_usec + usage.ru_stime.tv_usec);
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0)
        throw std::runtime_error(command[0] + " failed");
    return result;
}

struct TiffCloser {
    void operator()(TIFF *tiff) const { TIFFClose(tiff); }
};

// Largest relative difference between the pixels of two float32 files of
// one size and channel count (stripped or tiled); infinity when they differ
// in those or cannot be read.
double LargestRelativeDifference(const fs::path &a, const fs::path &b) {
    TIFFSetWarningHandler(nullptr); // GeoTIFF tags are unknown to libtiff
    std::unique_ptr<TIFF, TiffCloser> first(TIFFOpen(a.c_str(), "r"));
    std::unique_ptr<TIFF, TiffCloser> second(TIFFOpen(b.c_str(), "r"));
    if (!first || !second ||
        TIFFScanlineSize64(first.get()) != TIFFScanlineSize64(second.get()))
        return INFINITY;
    const std::vector<unsigned char> x = rs2test::ReadPixels(first.get());
    const std::vector<unsigned char> y = rs2test::ReadPixels(second.get());
    if (x.empty() || x.size() != y.size())
        return INFINITY;
    double largest = 0.0;
    for (size_t at = 0; at < x.size(); at += sizeof(float)) {
        float u = 0.0f, v = 0.0f;
        std::memcpy(&u, x.data() + at, sizeof u);
        std::memcpy(&v, y.data() + at, sizeof v);
        largest = std::max(largest, std::fabs(double(u) - v) /
                                        std::max(1e-30, std::fabs(double(v))));
    }
    return largest;
}

double Median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    const size_t n = values.size();
    return n % 2 ? values[n / 2] : 0.5 * (values[n / 2 - 1] + values[n / 2]);
}

struct Series {
    Series(std::string nameIn, std::vector<std::string> commandIn,
           fs::path outputIn)
        : name(std::move(nameIn)), command(std::move(commandIn)),
          output(std::move(outputIn)) {}

    std::string name;
    std::vector<std::string> command;
    fs::path output;
    std::vector<double> seconds;
    std::vector<double> cpuSeconds;
    double peakRssMiB = 0.0;
    double peakAnonMiB = 0.0;

    void Measure() {
        const RunResult result = Run(command);
        fs::remove(output);
        seconds.push_back(result.seconds);
        cpuSeconds.push_back(result.cpuSeconds);
        peakRssMiB = std::max(peakRssMiB, result.peakRssMiB);
        peakAnonMiB = std::max(peakAnonMiB, result.peakAnonMiB);
    }
};

int Repetitions(int argc, char **argv) {
    for (int i = 1; i + 1 < argc; ++i)
        if (std::strcmp(argv[i], "--repetitions") == 0)
            return std::max(1, std::atoi(argv[i + 1]));
    return 5;
}

} // namespace

int main(int argc, char **argv) {
    try {
        const int repetitions = Repetitions(argc, argv);
        const fs::path folder = BenchFolder();
        fs::create_directories(folder);
        const fs::path product = Product();
        Series rs2{"rs2 export ?c=sigma",
                   {RS2_TOOL, "export",
                    (product / "product.xml").string() + "?c=sigma",
                    (folder / "rs2_export.tif").string()},
                   folder / "rs2_export.tif"};
        Series lowerBound{"export_lower_bound",
                          {RS2_EXPORT_LOWER_BOUND,
                           (product / "lutSigma.xml").string(),
                           (folder / "lower_bound.tif").string(),
                           (product / rs2gen::ImageFileName("HH")).string(),
                           (product / rs2gen::ImageFileName("HV")).string()},
                          folder / "lower_bound.tif"};

        // Warm-up: the inputs into the page cache, and proof that both
        // programs compute the same thing.
        Run(rs2.command);
        Run(lowerBound.command);
        const double difference =
            LargestRelativeDifference(rs2.output, lowerBound.output);
        fs::remove(rs2.output);
        fs::remove(lowerBound.output);
        std::printf("outputs agree: largest relative difference %.3g\n",
                    difference);

        for (int i = 0; i < repetitions; ++i) {
            lowerBound.Measure();
            rs2.Measure();
        }
        std::printf("%-22s %10s %10s %10s %14s %14s\n", "program", "median s",
                    "min s", "CPU s", "peak RSS MiB", "peak anon MiB");
        for (const Series *series : {&lowerBound, &rs2})
            std::printf("%-22s %10.3f %10.3f %10.3f %14.1f %14.1f\n",
                        series->name.c_str(), Median(series->seconds),
                        *std::min_element(series->seconds.begin(),
                                          series->seconds.end()),
                        Median(series->cpuSeconds), series->peakRssMiB,
                        series->peakAnonMiB);
        std::printf("ratio rs2 / lower bound over %d runs: %.2f wall "
                    "(medians), %.2f CPU (medians)\n",
                    repetitions,
                    Median(rs2.seconds) / Median(lowerBound.seconds),
                    Median(rs2.cpuSeconds) / Median(lowerBound.cpuSeconds));
        return difference < 1e-6 ? 0 : 1;
    } catch (const std::exception &error) {
        std::fprintf(stderr, "export_bench: %s\n", error.what());
        return 1;
    }
}
