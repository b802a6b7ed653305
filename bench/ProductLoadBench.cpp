// Loading a product description against parsing it bare. LoadProduct parses
// product.xml once and every reader looks its elements up in that one
// document; the look-up tables it reads for the incidence angles are parsed
// as well. The yardstick is a bare XercesDOMParser parse of product.xml with
// the same validation scheme. See README.md for the figures.
//
// The product is the real one in the shared data folder unless
// RS2_BENCH_PRODUCT names another product.xml.

#include "host/XmlUtil.hpp"
#include "model/ProductVariants.hpp"
#include "product/Bands.hpp"
#include "product/CalibrationTables.hpp"
#include "product/DocumentAccess.hpp"
#include "product/MetadataExtraction.hpp"
#include "product/ProductReader.hpp"
#include "product/RationalFunctions.hpp"

#include <benchmark/benchmark.h>

#include <xercesc/parsers/XercesDOMParser.hpp>
#include <xercesc/util/PlatformUtils.hpp>

#include <cstdlib>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/stat.h>

namespace {

std::string ProductPath() {
    const char *path = std::getenv("RS2_BENCH_PRODUCT");
    return path != nullptr
               ? path
               : "/work/shared/realdata/rs2_slc_f0w2_hh_20170430/product.xml";
}

bool Exists(const std::string &path) {
    struct stat info;
    return stat(path.c_str(), &info) == 0;
}

// Holds the XML platform for a whole benchmark, so that neither side pays
// for setting it up and tearing it down on every iteration.
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

void ParseBare(const std::string &path,
               xercesc::XercesDOMParser::ValSchemes scheme) {
    xercesc::XercesDOMParser parser;
    parser.setValidationScheme(scheme);
    parser.parse(path.c_str());
    benchmark::DoNotOptimize(parser.getDocument());
}

void BM_BareParseValidating(benchmark::State &state) {
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    PlatformHold platform;
    for (auto _ : state)
        ParseBare(path, xercesc::XercesDOMParser::Val_Always);
}
BENCHMARK(BM_BareParseValidating)->Unit(benchmark::kMillisecond);

void BM_BareParseDefault(benchmark::State &state) {
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    PlatformHold platform;
    for (auto _ : state)
        ParseBare(path, xercesc::XercesDOMParser::Val_Never);
}
BENCHMARK(BM_BareParseDefault)->Unit(benchmark::kMillisecond);

void LoadOnce(const std::string &path) {
    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model(
        LoadProduct(reader, path.c_str(), ""));
    if (!model)
        throw std::runtime_error("the product did not load");
    benchmark::DoNotOptimize(model.get());
}

void BM_LoadProduct(benchmark::State &state) {
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    PlatformHold platform;
    for (auto _ : state)
        LoadOnce(path);
}
BENCHMARK(BM_LoadProduct)->Unit(benchmark::kMillisecond);

// As a host opening one product at a time sees it: the loader brings the
// XML platform up and down itself.
void BM_LoadProductColdPlatform(benchmark::State &state) {
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    for (auto _ : state)
        LoadOnce(path);
}
BENCHMARK(BM_LoadProductColdPlatform)->Unit(benchmark::kMillisecond);

// The readers LoadProduct runs, each on the parsed description, to show
// where loading spends its time beyond the parse.
template <class Step> void RunStep(benchmark::State &state, Step step) {
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    DocumentParse parse(path.c_str());
    if (parse.Document() == nullptr)
        return state.SkipWithError("product.xml did not parse");
    for (auto _ : state) {
        ProductReader reader;
        ZirOdi2SLC model;
        model.SetProductDirectory(path.c_str());
        step(reader, parse.Document(), model);
    }
}

void BM_StepIncidenceAngles(benchmark::State &state) {
    RunStep(state, [](ProductReader &, const xercesc::DOMDocument *document,
                      ZirOdi2CalibImage &model) {
        ReadIncidenceAngles(document, &model, IncidenceFormula::Complex);
    });
}
BENCHMARK(BM_StepIncidenceAngles)->Unit(benchmark::kMillisecond);

void BM_StepMetadata(benchmark::State &state) {
    RunStep(state,
            [](ProductReader &reader, const xercesc::DOMDocument *document,
               ZirOdi2CalibImage &model) {
                ReadPolarizations(document, &model);
                ExtractProductMetadata(reader, document, &model);
            });
}
BENCHMARK(BM_StepMetadata)->Unit(benchmark::kMillisecond);

void BM_StepRationalFunctions(benchmark::State &state) {
    RunStep(state,
            [](ProductReader &reader, const xercesc::DOMDocument *document,
               ZirOdi2CalibImage &model) {
                ReadRationalFunctions(reader, document, &model);
            });
}
BENCHMARK(BM_StepRationalFunctions)->Unit(benchmark::kMillisecond);

} // namespace

BENCHMARK_MAIN();
