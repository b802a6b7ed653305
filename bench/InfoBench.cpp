// What `rs2 info` costs against the least work it implies: opening the real
// product through the host and describing everything the driver presents
// (DescribeDataset, as `rs2 info` prints it) against bare XercesDOMParser
// parses of its product.xml and of its look-up table files. Both hold the
// XML platform for the whole benchmark. See README.md for the figures;
// bench/load_instructions.sh counts the instructions of both.

#include "bench/RealProduct.hpp"
#include "host/Raster.hpp"
#include "host/XmlUtil.hpp"
#include "tools/rs2/DatasetJson.hpp"

#include <benchmark/benchmark.h>

#include <xercesc/parsers/XercesDOMParser.hpp>

#include <chrono>
#include <string>
#include <sys/stat.h>

namespace {

const char *const kParsedFiles[] = {"product.xml", "lutSigma.xml",
                                    "lutBeta.xml", "lutGamma.xml"};

bool Exists(const std::string &path) {
    struct stat info;
    return stat(path.c_str(), &info) == 0;
}

__attribute__((noinline)) void ParseBareWithTables(const std::string &folder) {
    for (const char *name : kParsedFiles) {
        xercesc::XercesDOMParser parser;
        parser.setValidationScheme(xercesc::XercesDOMParser::Val_Always);
        parser.parse((folder + "/" + name).c_str());
        benchmark::DoNotOptimize(parser.getDocument());
    }
}

__attribute__((noinline)) void OpenAndDescribe(const std::string &folder) {
    const host::Raster raster = host::OpenRaster(folder + "/product.xml");
    nlohmann::json info = DescribeDataset(raster);
    benchmark::DoNotOptimize(info);
}

void BM_BareParseWithTables(benchmark::State &state) {
    const std::string folder = RealProductFolder();
    if (!Exists(folder + "/product.xml"))
        return state.SkipWithError("the real product is not there");
    XmlPlatformHold platform;
    for (auto _ : state)
        ParseBareWithTables(folder);
}
BENCHMARK(BM_BareParseWithTables)->Unit(benchmark::kMillisecond);

void BM_OpenAndDescribe(benchmark::State &state) {
    const std::string folder = RealProductFolder();
    if (!Exists(folder + "/product.xml"))
        return state.SkipWithError("the real product is not there");
    XmlPlatformHold platform;
    for (auto _ : state)
        OpenAndDescribe(folder);
}
BENCHMARK(BM_OpenAndDescribe)->Unit(benchmark::kMillisecond);

void BM_OpenOnly(benchmark::State &state) {
    const std::string folder = RealProductFolder();
    if (!Exists(folder + "/product.xml"))
        return state.SkipWithError("the real product is not there");
    XmlPlatformHold platform;
    for (auto _ : state) {
        const host::Raster raster = host::OpenRaster(folder + "/product.xml");
        benchmark::DoNotOptimize(raster.Width());
    }
}
BENCHMARK(BM_OpenOnly)->Unit(benchmark::kMillisecond);

double MillisecondsOf(void (*work)(const std::string &),
                      const std::string &folder) {
    const auto start = std::chrono::steady_clock::now();
    work(folder);
    return std::chrono::duration<double, std::milli>(
               std::chrono::steady_clock::now() - start)
        .count();
}

// Both sides in every iteration, so that they meet the same machine: the
// counters are their mean times and the mean of their ratios.
void BM_InfoOverBareParse(benchmark::State &state) {
    const std::string folder = RealProductFolder();
    if (!Exists(folder + "/product.xml"))
        return state.SkipWithError("the real product is not there");
    XmlPlatformHold platform;
    double parse = 0, info = 0, ratio = 0;
    for (auto _ : state) {
        const double parseMs = MillisecondsOf(ParseBareWithTables, folder);
        const double infoMs = MillisecondsOf(OpenAndDescribe, folder);
        parse += parseMs;
        info += infoMs;
        ratio += infoMs / parseMs;
    }
    using Counter = benchmark::Counter;
    state.counters["parse_ms"] = Counter(parse, Counter::kAvgIterations);
    state.counters["info_ms"] = Counter(info, Counter::kAvgIterations);
    state.counters["ratio"] = Counter(ratio, Counter::kAvgIterations);
}
BENCHMARK(BM_InfoOverBareParse)->Unit(benchmark::kMillisecond);

} // namespace

BENCHMARK_MAIN();
