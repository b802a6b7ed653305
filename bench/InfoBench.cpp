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

#include <string>
#include <sys/stat.h>

namespace {

const char *const kParsedFiles[] = {"product.xml", "lutSigma.xml",
                                    "lutBeta.xml", "lutGamma.xml"};

bool Exists(const std::string &path) {
    struct stat info;
    return stat(path.c_str(), &info) == 0;
}

class PlatformHold {
  public:
    PlatformHold() : held(ORV_XMLUtil::Initialize() != 0) {}
    ~PlatformHold() {
        if (held)
            ORV_XMLUtil::Terminate();
    }
    PlatformHold(const PlatformHold &) = delete;
    PlatformHold &operator=(const PlatformHold &) = delete;

  private:
    bool held;
};

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
    PlatformHold platform;
    for (auto _ : state)
        ParseBareWithTables(folder);
}
BENCHMARK(BM_BareParseWithTables)->Unit(benchmark::kMillisecond);

void BM_OpenAndDescribe(benchmark::State &state) {
    const std::string folder = RealProductFolder();
    if (!Exists(folder + "/product.xml"))
        return state.SkipWithError("the real product is not there");
    PlatformHold platform;
    for (auto _ : state)
        OpenAndDescribe(folder);
}
BENCHMARK(BM_OpenAndDescribe)->Unit(benchmark::kMillisecond);

} // namespace

BENCHMARK_MAIN();
