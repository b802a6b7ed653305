// Loading a product description against parsing it bare. LoadProduct parses
// product.xml once and every reader looks its elements up in that one
// document; the look-up tables it reads for the incidence angles are parsed
// as well. The yardstick is a bare XercesDOMParser parse of product.xml with
// the same validation scheme. See README.md for the figures.
//
// The product is the real one in the shared data folder unless
// RS2_BENCH_PRODUCT names another product folder.

#include "bench/RealProduct.hpp"
#include "host/TextServices.hpp"
#include "host/XmlUtil.hpp"
#include "model/ProductVariants.hpp"
#include "product/Bands.hpp"
#include "product/CalibrationTables.hpp"
#include "product/DocumentAccess.hpp"
#include "product/MetadataExtraction.hpp"
#include "product/ProductLoading.hpp"
#include "product/ProductReader.hpp"
#include "product/RationalFunctions.hpp"

#include <benchmark/benchmark.h>

#include <xercesc/parsers/XercesDOMParser.hpp>
#include <xercesc/util/PlatformUtils.hpp>

#include <chrono>
#include <cstdlib>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/stat.h>

namespace {

std::string ProductPath() { return RealProductFolder() + "/product.xml"; }

bool Exists(const std::string &path) {
    struct stat info;
    return stat(path.c_str(), &info) == 0;
}

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
    XmlPlatformHold platform;
    for (auto _ : state)
        ParseBare(path, xercesc::XercesDOMParser::Val_Always);
}
BENCHMARK(BM_BareParseValidating)->Unit(benchmark::kMillisecond);

void BM_BareParseDefault(benchmark::State &state) {
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    XmlPlatformHold platform;
    for (auto _ : state)
        ParseBare(path, xercesc::XercesDOMParser::Val_Never);
}
BENCHMARK(BM_BareParseDefault)->Unit(benchmark::kMillisecond);

void LoadOnce(const std::string &path, const char *calibration = "") {
    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model(
        LoadProduct(reader, path.c_str(), calibration));
    if (!model)
        throw std::runtime_error("the product did not load");
    benchmark::DoNotOptimize(model.get());
}

void BM_LoadProduct(benchmark::State &state) {
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    XmlPlatformHold platform;
    for (auto _ : state)
        LoadOnce(path);
}
BENCHMARK(BM_LoadProduct)->Unit(benchmark::kMillisecond);

// With Sigma Nought calibration: the Sigma table then serves both the
// calibration and the incidence angles, and is parsed once for both.
void BM_LoadProductSigma(benchmark::State &state) {
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    XmlPlatformHold platform;
    for (auto _ : state)
        LoadOnce(path, "sigma");
}
BENCHMARK(BM_LoadProductSigma)->Unit(benchmark::kMillisecond);

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

// What metadata extraction adds to a load. Each iteration times a whole
// LoadProduct and then the extraction alone on the parsed description (as
// LoadProduct runs it, on a description whose element index is built), so
// that both see the same machine on a busy one. metadata_share is the
// extraction's time over the rest of the load: 0.2 means it adds 20%.
void BM_MetadataShareOfLoad(benchmark::State &state) {
    using Clock = std::chrono::steady_clock;
    const std::string path = ProductPath();
    if (!Exists(path))
        return state.SkipWithError("product.xml not found");
    // The parse holds the XML platform for the loads as well.
    DocumentParse parse(path.c_str());
    const xercesc::DOMDocument *document = parse.Document();
    if (document == nullptr)
        return state.SkipWithError("product.xml did not parse");
    // LoadProduct's first lookup builds the element index before the
    // extraction runs; so does this one.
    ParseProductType(document);
    std::chrono::duration<double> load{};
    std::chrono::duration<double> metadata{};
    for (auto _ : state) {
        const Clock::time_point start = Clock::now();
        LoadOnce(path);
        const Clock::time_point loaded = Clock::now();
        ProductReader reader;
        reader.productPath = HString(path.c_str());
        ZirOdi2SLC model;
        model.SetProductDirectory(path.c_str());
        ReadPolarizations(document, &model);
        ExtractProductMetadata(reader, document, &model);
        load += loaded - start;
        metadata += Clock::now() - loaded;
    }
    const double iterations = static_cast<double>(state.iterations());
    state.counters["load_ms"] = load.count() * 1e3 / iterations;
    state.counters["metadata_ms"] = metadata.count() * 1e3 / iterations;
    state.counters["metadata_share"] = metadata / (load - metadata);
}
BENCHMARK(BM_MetadataShareOfLoad)->Unit(benchmark::kMillisecond);

} // namespace

BENCHMARK_MAIN();
