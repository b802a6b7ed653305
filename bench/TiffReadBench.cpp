// Reads one large uint16 GeoTIFF three ways: a plain libtiff strip loop
// converting to float (the yardstick), the built-in reader at full
// resolution in bands of lines, and the built-in reader decimated to 1/8 in
// each direction. See README.md for what the figures must show.

#include "host/GeoTiffImage.hpp"

#include <benchmark/benchmark.h>
#include <tiffio.h>

#include <algorithm>
#include <cstdarg>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/resource.h>
#include <vector>

namespace {

constexpr uint32_t kSize = 8000;     // pixels and lines
constexpr uint32_t kBandLines = 256; // lines per full-resolution read call
constexpr uint32_t kDecimation = 8;
constexpr double kImageBytes = double(kSize) * kSize * sizeof(uint16_t);

struct TiffCloser {
    void operator()(TIFF *tif) const { TIFFClose(tif); }
};
using TiffOwner = std::unique_ptr<TIFF, TiffCloser>;

// A GeoTIFF needs its pixel scale and tie point tags defined to write them.
void DefineGeoTags(TIFF *tif) {
    static char scaleName[] = "GeoPixelScale";
    static char tieName[] = "GeoTiePoints";
    static const TIFFFieldInfo fields[] = {
        {33550, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_DOUBLE, FIELD_CUSTOM, 1, 1,
         scaleName},
        {33922, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_DOUBLE, FIELD_CUSTOM, 1, 1,
         tieName},
    };
    TIFFMergeFieldInfo(tif, fields, 2);
}

// Strips of libtiff's default height (about 8 KiB each: one line here).
void WriteBenchFile(const std::string &path) {
    TiffOwner tif(TIFFOpen(path.c_str(), "w"));
    if (!tif)
        throw std::runtime_error("cannot create " + path);
    TIFFSetField(tif.get(), TIFFTAG_IMAGEWIDTH, kSize);
    TIFFSetField(tif.get(), TIFFTAG_IMAGELENGTH, kSize);
    TIFFSetField(tif.get(), TIFFTAG_BITSPERSAMPLE, 16);
    TIFFSetField(tif.get(), TIFFTAG_SAMPLESPERPIXEL, 1);
    TIFFSetField(tif.get(), TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
    TIFFSetField(tif.get(), TIFFTAG_ROWSPERSTRIP,
                 TIFFDefaultStripSize(tif.get(), 0));
    DefineGeoTags(tif.get());
    const double scale[] = {0.0001, 0.0001, 0};
    const double tie[] = {0, 0, 0, -120.0, 45.0, 0};
    TIFFSetField(tif.get(), 33550, 3, scale);
    TIFFSetField(tif.get(), 33922, 6, tie);
    std::vector<uint16_t> line(kSize);
    for (uint32_t y = 0; y < kSize; ++y) {
        for (uint32_t x = 0; x < kSize; ++x)
            line[x] = static_cast<uint16_t>(x * 3 + y * 7);
        if (TIFFWriteScanline(tif.get(), line.data(), y, 0) < 0)
            throw std::runtime_error("cannot write " + path);
    }
}

// The file is kept between runs (RS2_BENCH_TIFF names another place).
const std::string &BenchFile() {
    static const std::string path = [] {
        const char *chosen = std::getenv("RS2_BENCH_TIFF");
        std::string file = chosen != nullptr
                               ? chosen
                               : (std::filesystem::temp_directory_path() /
                                  "rs2_tiff_read_bench_8000.tif")
                                     .string();
        // Written aside and renamed, so that an interrupted run leaves no
        // partial file to be taken for a finished one.
        if (!std::filesystem::exists(file)) {
            WriteBenchFile(file + ".partial");
            std::filesystem::rename(file + ".partial", file);
        }
        return file;
    }();
    return path;
}

// Anonymous resident memory (allocations, not mapped file pages), in MiB.
double ResidentAnonymousMiB() {
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);)
        if (line.rfind("RssAnon:", 0) == 0)
            return std::stod(line.substr(8)) / 1024.0;
    return 0.0;
}

// Throughput counts the bytes of the source image a read covers. Peak RSS
// includes the pages of the memory-mapped file; anonymous memory does not.
void Report(benchmark::State &state) {
    state.SetBytesProcessed(int64_t(state.iterations() * kImageBytes));
    struct rusage usage {};
    getrusage(RUSAGE_SELF, &usage);
    state.counters["peak_rss_MiB"] = double(usage.ru_maxrss) / 1024.0;
    state.counters["anon_MiB"] = ResidentAnonymousMiB();
}

int DropWarning(TIFF *, void *, const char *, const char *, va_list) {
    return 1;
}

// libtiff's default opening (memory-mapped), quiet about the geo tags it
// does not know.
TiffOwner OpenPlain(const std::string &path) {
    std::unique_ptr<TIFFOpenOptions, void (*)(TIFFOpenOptions *)> options(
        TIFFOpenOptionsAlloc(), TIFFOpenOptionsFree);
    TIFFOpenOptionsSetWarningHandlerExtR(options.get(), DropWarning, nullptr);
    TiffOwner tif(TIFFOpenExt(path.c_str(), "r", options.get()));
    if (!tif)
        throw std::runtime_error("cannot open " + path);
    return tif;
}

void PlainLibtiffStrips(benchmark::State &state) {
    TiffOwner tif = OpenPlain(BenchFile());
    const uint32_t strips = TIFFNumberOfStrips(tif.get());
    uint32_t rowsPerStrip = 0;
    TIFFGetField(tif.get(), TIFFTAG_ROWSPERSTRIP, &rowsPerStrip);
    std::vector<uint16_t> strip(size_t(TIFFStripSize(tif.get())) / 2);
    std::vector<float> band(size_t(kBandLines) * kSize);
    for (auto _ : state) {
        for (uint32_t s = 0; s < strips; ++s) {
            const tmsize_t bytes = TIFFReadEncodedStrip(
                tif.get(), s, strip.data(), tmsize_t(strip.size() * 2));
            if (bytes < 0) {
                state.SkipWithError("a strip cannot be read");
                return;
            }
            const size_t first = size_t(s) * rowsPerStrip % kBandLines * kSize;
            const size_t count =
                std::min(size_t(bytes) / 2, band.size() - first);
            for (size_t i = 0; i < count; ++i)
                band[first + i] = static_cast<float>(strip[i]);
        }
        benchmark::DoNotOptimize(band.data());
        benchmark::ClobberMemory();
    }
    Report(state);
}

void FullResolutionRead(benchmark::State &state) {
    std::unique_ptr<host::GeoTiffImage> image =
        host::GeoTiffImage::Open(BenchFile());
    std::vector<float> band(size_t(kBandLines) * kSize);
    for (auto _ : state) {
        for (uint32_t y = 0; y < kSize; y += kBandLines) {
            const auto lines = int32_t(std::min(kBandLines, kSize - y));
            image->ReadReal32(
                {0, int32_t(y), int32_t(kSize), lines, int32_t(kSize), lines},
                {1}, band.data());
        }
        benchmark::DoNotOptimize(band.data());
        benchmark::ClobberMemory();
    }
    Report(state);
}

void DecimatedRead(benchmark::State &state) {
    std::unique_ptr<host::GeoTiffImage> image =
        host::GeoTiffImage::Open(BenchFile());
    constexpr auto kOut = int32_t(kSize / kDecimation);
    std::vector<float> out(size_t(kOut) * kOut);
    for (auto _ : state) {
        image->ReadReal32({0, 0, int32_t(kSize), int32_t(kSize), kOut, kOut},
                          {1}, out.data());
        benchmark::DoNotOptimize(out.data());
        benchmark::ClobberMemory();
    }
    Report(state);
}

// Real time: reading from the page cache is system time as much as user
// time. Five repetitions give a median that other work on the machine
// disturbs less.
void Configure(benchmark::internal::Benchmark *benchmark) {
    benchmark->Unit(benchmark::kMillisecond)
        ->UseRealTime()
        ->Repetitions(5)
        ->ReportAggregatesOnly(true);
}

BENCHMARK(PlainLibtiffStrips)->Apply(Configure);
BENCHMARK(FullResolutionRead)->Apply(Configure);
BENCHMARK(DecimatedRead)->Apply(Configure);

} // namespace

BENCHMARK_MAIN();
