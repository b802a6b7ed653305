#include "tools/generator/ProductGenerator.hpp"
#include "tests/support/TempDir.hpp"

#include <gtest/gtest.h>
#include <tiffio.h>
#include <xercesc/dom/DOM.hpp>
#include <xercesc/parsers/XercesDOMParser.hpp>
#include <xercesc/sax/ErrorHandler.hpp>
#include <xercesc/sax/SAXParseException.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLString.hpp>

#include <cmath>
#include <cstdarg>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

namespace {

using rs2gen::GenerateProduct;
using rs2gen::ProductOptions;
namespace fs = std::filesystem;

constexpr double degreesPerRadian = 57.29577951308232;
// GeoTIFF tags, unknown to plain libtiff.
constexpr uint32_t modelTiepointTag = 33922;
constexpr uint32_t geoKeyDirectoryTag = 34735;
const char *const productTypes[] = {"SLC", "SGX", "SGF", "SGC",
                                    "SCN", "SCW", "SSG", "SPG"};

// ---- Reading the written files back -------------------------------------

// Owns a TIFF opened for reading with plain libtiff, which knows nothing of
// the GeoTIFF tags unless the generator registered them: its messages about
// them are expected and kept quiet.
class TiffReader {
  public:
    explicit TiffReader(const std::string &path) {
        const std::unique_ptr<TIFFOpenOptions, decltype(&TIFFOpenOptionsFree)>
            options(TIFFOpenOptionsAlloc(), &TIFFOpenOptionsFree);
        TIFFOpenOptionsSetErrorHandlerExtR(options.get(), &Quiet, nullptr);
        TIFFOpenOptionsSetWarningHandlerExtR(options.get(), &Quiet, nullptr);
        tiff = TIFFOpenExt(path.c_str(), "r", options.get());
    }
    ~TiffReader() {
        if (tiff != nullptr)
            TIFFClose(tiff);
    }
    TiffReader(const TiffReader &) = delete;
    TiffReader &operator=(const TiffReader &) = delete;

    bool IsOpen() const { return tiff != nullptr; }

    template <typename Value> Value Field(uint32_t tag) const {
        Value value{};
        EXPECT_EQ(TIFFGetField(tiff, tag, &value), 1) << "tag " << tag;
        return value;
    }

    // An array tag whose count type depends on how the tag was registered;
    // empty when the file lacks it.
    template <typename Value> std::vector<Value> Array(uint32_t tag) const {
        const TIFFField *field = TIFFFieldWithTag(tiff, tag);
        const void *data = nullptr;
        uint32_t count = 0;
        if (field != nullptr && TIFFFieldReadCount(field) == TIFF_VARIABLE2) {
            if (TIFFGetField(tiff, tag, &count, &data) != 1)
                return {};
        } else {
            uint16_t shortCount = 0;
            if (field == nullptr ||
                TIFFGetField(tiff, tag, &shortCount, &data) != 1)
                return {};
            count = shortCount;
        }
        const Value *first = static_cast<const Value *>(data);
        return std::vector<Value>(first, first + count);
    }

    template <typename Sample> std::vector<Sample> Line(uint32_t y) const {
        std::vector<Sample> line(static_cast<size_t>(TIFFScanlineSize64(tiff)) /
                                 sizeof(Sample));
        EXPECT_EQ(TIFFReadScanline(tiff, line.data(), y, 0), 1) << "line " << y;
        return line;
    }

  private:
    static int Quiet(TIFF *, void *, const char *, const char *, va_list) {
        return 1;
    }

    TIFF *tiff = nullptr;
};

std::string Narrow(const XMLCh *text) {
    const std::unique_ptr<char, void (*)(char *)> narrow(
        xercesc::XMLString::transcode(text),
        [](char *p) { xercesc::XMLString::release(&p); });
    return narrow ? narrow.get() : "";
}

class WideText {
  public:
    explicit WideText(const std::string &text)
        : wide(xercesc::XMLString::transcode(text.c_str())) {}
    ~WideText() { xercesc::XMLString::release(&wide); }
    WideText(const WideText &) = delete;
    WideText &operator=(const WideText &) = delete;
    const XMLCh *Get() const { return wide; }

  private:
    XMLCh *wide;
};

class CountingErrorHandler : public xercesc::ErrorHandler {
  public:
    void warning(const xercesc::SAXParseException &) override {}
    void error(const xercesc::SAXParseException &) override { ++count; }
    void fatalError(const xercesc::SAXParseException &) override { ++count; }
    void resetErrors() override { count = 0; }
    int count = 0;
};

// A parsed XML file; elements are looked up by tag anywhere in it, as the
// driver does.
class XmlDocument {
  public:
    explicit XmlDocument(const std::string &path) {
        xercesc::XMLPlatformUtils::Initialize();
        parser = std::make_unique<xercesc::XercesDOMParser>();
        parser->setErrorHandler(&errors);
        parser->parse(path.c_str());
    }
    ~XmlDocument() {
        parser.reset();
        xercesc::XMLPlatformUtils::Terminate();
    }
    XmlDocument(const XmlDocument &) = delete;
    XmlDocument &operator=(const XmlDocument &) = delete;

    int ErrorCount() const { return errors.count; }
    const xercesc::DOMElement *Root() const {
        return parser->getDocument()->getDocumentElement();
    }
    std::vector<std::string> Texts(const std::string &tag) const {
        std::vector<std::string> texts;
        for (const xercesc::DOMElement *element : Elements(tag))
            texts.push_back(Narrow(element->getTextContent()));
        return texts;
    }
    std::string Text(const std::string &tag) const {
        const std::vector<std::string> texts = Texts(tag);
        return texts.empty() ? "" : texts.front();
    }
    std::vector<std::string> Attributes(const std::string &tag,
                                        const std::string &name) const {
        std::vector<std::string> values;
        for (const xercesc::DOMElement *element : Elements(tag))
            values.push_back(
                Narrow(element->getAttribute(WideText(name).Get())));
        return values;
    }

  private:
    std::vector<const xercesc::DOMElement *>
    Elements(const std::string &tag) const {
        const xercesc::DOMNodeList *nodes =
            parser->getDocument()->getElementsByTagName(WideText(tag).Get());
        std::vector<const xercesc::DOMElement *> elements;
        for (XMLSize_t i = 0; i < nodes->getLength(); ++i)
            elements.push_back(
                static_cast<const xercesc::DOMElement *>(nodes->item(i)));
        return elements;
    }

    CountingErrorHandler errors;
    std::unique_ptr<xercesc::XercesDOMParser> parser;
};

std::vector<std::string> Tokens(const std::string &text) {
    std::istringstream in(text);
    return {std::istream_iterator<std::string>(in),
            std::istream_iterator<std::string>()};
}

std::vector<double> Numbers(const std::vector<std::string> &texts) {
    std::vector<double> numbers;
    for (const std::string &text : texts)
        numbers.push_back(std::strtod(text.c_str(), nullptr));
    return numbers;
}

std::string FileBytes(const fs::path &path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in),
            std::istreambuf_iterator<char>()};
}

ProductOptions Options(const std::string &type,
                       std::vector<std::string> polarizations = {"HH"}) {
    ProductOptions options;
    options.productType = type;
    options.polarizations = std::move(polarizations);
    return options;
}

// ---- Images ---------------------------------------------------------------

TEST(ProductGenerator, detected_images_hold_the_truth_function_samples) {
    struct Case {
        const char *type;
        std::vector<std::string> polarizations;
        bool packBits;
    };
    const Case cases[] = {{"SGF", {"HH"}, false},
                          {"SCW", {"VV", "VH"}, true},
                          {"SSG", {"HH", "HV"}, false}};
    for (const Case &c : cases) {
        SCOPED_TRACE(c.type);
        rs2test::TempDir folder;
        ProductOptions options = Options(c.type, c.polarizations);
        options.width = 37; // odd sizes catch row-length mistakes
        options.height = 29;
        options.packBits = c.packBits;
        const auto product = GenerateProduct(folder.Path(), options);
        ASSERT_EQ(product.imageFiles.size(), c.polarizations.size());
        for (size_t p = 0; p < product.imageFiles.size(); ++p) {
            const TiffReader tiff(product.imageFiles[p]);
            ASSERT_TRUE(tiff.IsOpen()) << product.imageFiles[p];
            EXPECT_EQ(tiff.Field<uint32_t>(TIFFTAG_IMAGEWIDTH), 37u);
            EXPECT_EQ(tiff.Field<uint32_t>(TIFFTAG_IMAGELENGTH), 29u);
            EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_BITSPERSAMPLE), 16);
            EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_SAMPLESPERPIXEL), 1);
            EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_SAMPLEFORMAT),
                      SAMPLEFORMAT_UINT);
            EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_COMPRESSION),
                      c.packBits ? COMPRESSION_PACKBITS : COMPRESSION_NONE);
            int mismatches = 0;
            for (int y = 0; y < options.height; ++y) {
                const auto line = tiff.Line<uint16_t>(y);
                ASSERT_EQ(line.size(), 37u);
                for (int x = 0; x < options.width; ++x)
                    mismatches += line[x] !=
                                  rs2gen::DetectedSample(options, int(p), x, y);
            }
            EXPECT_EQ(mismatches, 0);
        }
    }
}

TEST(ProductGenerator, complex_images_hold_in_phase_and_quadrature_pairs) {
    rs2test::TempDir folder;
    ProductOptions options = Options("SLC", {"HH", "HV"});
    options.width = 41;
    options.height = 23;
    const auto product = GenerateProduct(folder.Path(), options);
    for (size_t p = 0; p < 2; ++p) {
        const TiffReader tiff(product.imageFiles[p]);
        ASSERT_TRUE(tiff.IsOpen());
        EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_SAMPLESPERPIXEL), 2);
        EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_SAMPLEFORMAT), SAMPLEFORMAT_INT);
        EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_PLANARCONFIG),
                  PLANARCONFIG_CONTIG);
        int mismatches = 0;
        for (int y = 0; y < options.height; ++y) {
            const auto line = tiff.Line<int16_t>(y);
            ASSERT_EQ(line.size(), 2u * 41);
            for (int x = 0; x < options.width; ++x) {
                const auto [i, q] =
                    rs2gen::ComplexSample(options, int(p), x, y);
                mismatches += line[2 * x] != i || line[2 * x + 1] != q;
            }
        }
        EXPECT_EQ(mismatches, 0);
    }
}

struct Statistics {
    double mean = 0, deviation = 0;
};

template <typename SampleAt>
Statistics StatisticsOver(int x0, int x1, int height, SampleAt sampleAt) {
    double sum = 0, squares = 0;
    int count = 0;
    for (int y = 0; y < height; ++y)
        for (int x = x0; x < x1; ++x, ++count) {
            const double value = sampleAt(x, y);
            sum += value;
            squares += value * value;
        }
    const double mean = sum / count;
    return {mean, std::sqrt(squares / count - mean * mean)};
}

TEST(ProductGenerator,
     detected_content_is_speckled_and_darkens_toward_far_range) {
    for (bool farRangeFirst : {false, true}) {
        SCOPED_TRACE(farRangeFirst);
        ProductOptions options = Options("SGX", {"HH", "HV"});
        options.width = 160;
        options.height = 120;
        options.pixelTimeDecreasing = farRangeFirst;
        auto hh = [&](int x, int y) {
            return rs2gen::DetectedSample(options, 0, x, y);
        };
        auto hv = [&](int x, int y) {
            return rs2gen::DetectedSample(options, 1, x, y);
        };
        const Statistics all = StatisticsOver(0, 160, 120, hh);
        // Single-look amplitude speckle alone varies by about half its mean.
        EXPECT_GT(all.deviation / all.mean, 0.4);
        const Statistics left = StatisticsOver(0, 40, 120, hh);
        const Statistics right = StatisticsOver(120, 160, 120, hh);
        const double nearOverFar =
            farRangeFirst ? right.mean / left.mean : left.mean / right.mean;
        EXPECT_GT(nearOverFar, 1.2);
        EXPECT_LT(StatisticsOver(0, 160, 120, hv).mean, 0.5 * all.mean);
    }
}

TEST(ProductGenerator, complex_speckle_has_zero_mean_and_uncorrelated_parts) {
    const ProductOptions options = Options("SLC");
    double sumI = 0, sumQ = 0, sumIQ = 0, sumII = 0, sumQQ = 0;
    for (int y = 0; y < options.height; ++y)
        for (int x = 0; x < options.width; ++x) {
            const auto [i, q] = rs2gen::ComplexSample(options, 0, x, y);
            sumI += i;
            sumQ += q;
            sumIQ += double(i) * q;
            sumII += double(i) * i;
            sumQQ += double(q) * q;
        }
    const double n = options.width * options.height;
    const double deviationI = std::sqrt(sumII / n);
    EXPECT_GT(deviationI, 20.0);
    EXPECT_LT(std::fabs(sumI / n), 0.1 * deviationI);
    EXPECT_LT(std::fabs(sumQ / n), 0.1 * deviationI);
    EXPECT_LT(std::fabs(sumIQ / std::sqrt(sumII * sumQQ)), 0.1);
}

TEST(ProductGenerator, same_seed_repeats_every_byte_and_another_seed_does_not) {
    rs2test::TempDir first, second, third;
    ProductOptions options = Options("SLC", {"HH", "VV"});
    options.seed = 7;
    options.sideFile = true;
    GenerateProduct(first.Path(), options);
    GenerateProduct(second.Path(), options);
    options.seed = 8;
    GenerateProduct(third.Path(), options);
    int compared = 0;
    for (const auto &entry : fs::directory_iterator(first.Path())) {
        const fs::path name = entry.path().filename();
        EXPECT_EQ(FileBytes(entry.path()), FileBytes(second.Path() / name))
            << name;
        ++compared;
    }
    EXPECT_EQ(compared, 7); // product.xml, 3 tables, 2 images, side file
    EXPECT_NE(FileBytes(first.File("imagery_HH.tif")),
              FileBytes(third.File("imagery_HH.tif")));
    EXPECT_NE(FileBytes(first.File("imagery_VV.tif")),
              FileBytes(first.File("imagery_HH.tif")));
}

// ---- product.xml --------------------------------------------------------

TEST(ProductGenerator, product_xml_is_well_formed_and_holds_the_read_elements) {
    rs2test::TempDir folder;
    const ProductOptions options = Options("SGF", {"HH", "HV"});
    const XmlDocument xml(GenerateProduct(folder.Path(), options).productXml);
    ASSERT_EQ(xml.ErrorCount(), 0);
    EXPECT_EQ(Narrow(xml.Root()->getTagName()), "product");
    EXPECT_EQ(Narrow(xml.Root()->getAttribute(WideText("xmlns").Get())),
              "http://www.rsi.ca/rs2/prod/xml/schemas");

    // The elements the driver reads, all but the repeated ones once.
    const std::string singleElements =
        "productId beamModeMnemonic acquisitionType antennaPointing "
        "polarizations radarCenterFrequency pulseRepetitionFrequency "
        "passDirection rawDataStartTime productType zeroDopplerTimeFirstLine "
        "zeroDopplerTimeLastLine numberOfRangeLooks numberOfAzimuthLooks "
        "incidenceAngleNearRange incidenceAngleFarRange slantRangeNearEdge "
        "satelliteHeight dopplerCentroidCoefficients "
        "dopplerCentroidReferenceTime groundRangeOrigin "
        "groundToSlantRangeCoefficients productFormat numberOfSamplesPerLine "
        "numberOfLines sampledPixelSpacing sampledLineSpacing "
        "lineTimeOrdering pixelTimeOrdering rationalFunctions lineOffset "
        "pixelScale heightOffset lineNumeratorCoefficients "
        "pixelDenominatorCoefficients referenceEllipsoidParameters "
        "ellipsoidName semiMajorAxis semiMinorAxis geodeticTerrainHeight";
    for (const std::string &tag : Tokens(singleElements))
        EXPECT_EQ(xml.Texts(tag).size(), 1u) << tag;
    const struct {
        const char *tag;
        size_t count;
    } repeatedElements[] = {
        {"referenceNoiseLevel", 3}, {"noiseLevelValues", 3},
        {"stateVector", 5},         {"xVelocity", 5},
        {"attitudeAngles", 5},      {"pitch", 5},
        {"imageCoordinate", 121},   {"geodeticCoordinate", 121},
        {"lookupTable", 3},         {"fullResolutionImageData", 2}};
    for (const auto &element : repeatedElements)
        EXPECT_EQ(xml.Texts(element.tag).size(), element.count) << element.tag;

    const struct {
        const char *tag;
        const char *text;
    } values[] = {{"productType", "SGF"},
                  {"polarizations", "HH HV"},
                  {"acquisitionType", "Fine"},
                  {"numberOfSamplesPerLine", "64"},
                  {"numberOfLines", "48"},
                  {"productFormat", "GeoTIFF"},
                  {"antennaPointing", "Right"},
                  {"passDirection", "Ascending"},
                  {"lineTimeOrdering", "Increasing"},
                  {"pixelTimeOrdering", "Increasing"}};
    for (const auto &value : values)
        EXPECT_EQ(xml.Text(value.tag), value.text) << value.tag;

    EXPECT_EQ(Tokens(xml.Text("groundToSlantRangeCoefficients")).size(), 6u);
    for (const char *tag :
         {"lineNumeratorCoefficients", "lineDenominatorCoefficients",
          "pixelNumeratorCoefficients", "pixelDenominatorCoefficients"})
        EXPECT_EQ(Tokens(xml.Text(tag)).size(), 20u) << tag;
    const auto noiseCounts = xml.Texts("numberOfNoiseLevelValues");
    const auto noiseValues = xml.Texts("noiseLevelValues");
    for (size_t i = 0; i < noiseValues.size(); ++i)
        EXPECT_EQ(std::to_string(Tokens(noiseValues[i]).size()),
                  noiseCounts[i]);
    EXPECT_EQ(
        xml.Attributes("lookupTable", "incidenceAngleCorrection"),
        (std::vector<std::string>{"Beta Nought", "Sigma Nought", "Gamma"}));
    EXPECT_EQ(xml.Texts("lookupTable"),
              (std::vector<std::string>{"lutBeta.xml", "lutSigma.xml",
                                        "lutGamma.xml"}));
    EXPECT_EQ(xml.Attributes("fullResolutionImageData", "pole"),
              (std::vector<std::string>{"HH", "HV"}));
    EXPECT_EQ(xml.Texts("fullResolutionImageData"),
              (std::vector<std::string>{"imagery_HH.tif", "imagery_HV.tif"}));
}

TEST(ProductGenerator, every_type_and_polarization_count_writes_its_files) {
    const std::vector<std::string> polarizationSets[] = {
        {"HH"}, {"VV", "VH"}, {"HH", "VV", "HV", "VH"}};
    for (const char *type : productTypes)
        for (const auto &polarizations : polarizationSets) {
            SCOPED_TRACE(std::string(type) + " x" +
                         std::to_string(polarizations.size()));
            rs2test::TempDir folder;
            ProductOptions options = Options(type, polarizations);
            options.width = 9;
            options.height = 7;
            const auto product = GenerateProduct(folder.Path(), options);
            for (const char *file :
                 {"product.xml", "lutBeta.xml", "lutSigma.xml", "lutGamma.xml"})
                EXPECT_TRUE(fs::is_regular_file(folder.File(file))) << file;
            for (const std::string &polarization : polarizations)
                EXPECT_TRUE(fs::is_regular_file(
                    folder.File("imagery_" + polarization + ".tif")));
            EXPECT_FALSE(fs::exists(folder.File("ProductDescription.self")));
            const XmlDocument xml(product.productXml);
            ASSERT_EQ(xml.ErrorCount(), 0);
            EXPECT_EQ(xml.Text("productType"), type);
            EXPECT_EQ(xml.Texts("fullResolutionImageData").size(),
                      polarizations.size());
            const std::string expectedAcquisition =
                polarizations.size() == 4    ? "Fine Quad Polarization"
                : type == std::string("SCN") ? "ScanSAR Narrow"
                : type == std::string("SCW") ? "ScanSAR Wide"
                                             : "Fine";
            EXPECT_EQ(xml.Text("acquisitionType"), expectedAcquisition);
            const bool complex = type == std::string("SLC");
            EXPECT_EQ(xml.Text("dataType"),
                      complex ? "Complex" : "Magnitude Detected");
        }
}

TEST(ProductGenerator, options_leave_out_exactly_their_parts) {
    struct Case {
        const char *name;
        void (*change)(ProductOptions &);
        bool luts, images, grid, imageTiePoints, rpc, sideFile;
    };
    const Case cases[] = {
        {"defaults", [](ProductOptions &) {}, true, true, true, true, true,
         false},
        {"no tables", [](ProductOptions &o) { o.lookupTables = false; }, false,
         true, true, true, true, false},
        {"no images", [](ProductOptions &o) { o.images = false; }, true, false,
         true, false, true, false},
        {"no rpc", [](ProductOptions &o) { o.rationalFunctions = false; }, true,
         true, true, true, false, false},
        {"no tie points", [](ProductOptions &o) { o.tiePoints = false; }, true,
         true, false, false, true, false},
        {"image tie points only",
         [](ProductOptions &o) { o.geolocationGrid = false; }, true, true,
         false, true, true, false},
        {"side file", [](ProductOptions &o) { o.sideFile = true; }, true, true,
         true, true, true, true},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.name);
        rs2test::TempDir folder;
        ProductOptions options = Options("SGF");
        c.change(options);
        const auto product = GenerateProduct(folder.Path(), options);
        EXPECT_EQ(fs::exists(folder.File("lutSigma.xml")), c.luts);
        EXPECT_EQ(fs::exists(folder.File("imagery_HH.tif")), c.images);
        EXPECT_EQ(fs::exists(folder.File("ProductDescription.self")),
                  c.sideFile);
        const XmlDocument xml(product.productXml);
        // The document names its tables and images whether written or not.
        EXPECT_EQ(xml.Texts("lookupTable").size(), 3u);
        EXPECT_EQ(xml.Texts("fullResolutionImageData").size(), 1u);
        EXPECT_EQ(xml.Texts("imageTiePoint").empty(), !c.grid);
        EXPECT_EQ(xml.Texts("rationalFunctions").empty(), !c.rpc);
        if (c.images) {
            const TiffReader tiff(product.imageFiles[0]);
            EXPECT_EQ(tiff.Array<double>(modelTiepointTag).empty(),
                      !c.imageTiePoints);
        }
    }
}

TEST(ProductGenerator, side_file_sections_repeat_the_acquisition_times) {
    rs2test::TempDir folder;
    ProductOptions options = Options("SCN", {"HH", "HV"});
    options.sideFile = true;
    options.lineTimeDecreasing = true;
    const XmlDocument xml(GenerateProduct(folder.Path(), options).productXml);
    std::ifstream in(folder.File("ProductDescription.self"));
    std::string line, section, startTime, endTime;
    int sections = 0;
    while (std::getline(in, line)) {
        const size_t equals = line.find('=');
        ASSERT_NE(equals, std::string::npos) << line;
        const std::string key = Tokens(line.substr(0, equals)).at(0);
        const std::string value = line.substr(equals + 1);
        if (value.empty()) {
            section = key;
            ++sections;
            continue;
        }
        ASSERT_EQ(value.back(), ';') << line;
        const std::string text =
            Tokens(value.substr(0, value.size() - 1)).at(0);
        if (section == "sourceInfo" && key == "startTime")
            startTime = text;
        if (section == "sourceInfo" && key == "endTime")
            endTime = text;
    }
    EXPECT_EQ(sections, 3);
    // Line 0 is the latest line of a product with decreasing line times.
    EXPECT_EQ(startTime, xml.Text("zeroDopplerTimeLastLine"));
    EXPECT_EQ(endTime, xml.Text("zeroDopplerTimeFirstLine"));
}

// ---- Look-up tables -----------------------------------------------------

TEST(ProductGenerator,
     lookup_tables_parse_back_to_gains_of_the_incidence_angles) {
    struct Case {
        const char *type;
        bool farRangeFirst;
        float offset;
    };
    for (const Case &c : {Case{"SGF", false, 0.0f}, Case{"SCW", true, 2.5f},
                          Case{"SLC", false, 0.0f}, Case{"SLC", true, 0.0f}}) {
        SCOPED_TRACE(std::string(c.type) + (c.farRangeFirst ? " far" : ""));
        rs2test::TempDir folder;
        ProductOptions options = Options(c.type);
        options.pixelTimeDecreasing = c.farRangeFirst;
        options.lutOffset = c.offset;
        const auto product = GenerateProduct(folder.Path(), options);
        std::vector<std::vector<float>> gains; // beta, sigma, gamma
        for (const auto &[kind, file] :
             {std::pair{"Beta Nought", "lutBeta.xml"},
              std::pair{"Sigma Nought", "lutSigma.xml"},
              std::pair{"Gamma", "lutGamma.xml"}}) {
            const XmlDocument lut(folder.File(file));
            ASSERT_EQ(lut.ErrorCount(), 0);
            std::vector<float> parsed;
            for (const std::string &token : Tokens(lut.Text("gains")))
                parsed.push_back(std::strtof(token.c_str(), nullptr));
            EXPECT_EQ(parsed, rs2gen::LookupTableGains(options, kind));
            EXPECT_EQ(std::strtof(lut.Text("offset").c_str(), nullptr),
                      rs2gen::LookupTableOffset(options, kind));
            EXPECT_EQ(rs2gen::LookupTableOffset(options, kind), c.offset);
            gains.push_back(parsed);
        }
        ASSERT_EQ(gains[0].size(), size_t(options.width));
        // Detected gains divide power, SLC gains amplitude.
        const double power = std::string(c.type) == "SLC" ? 2.0 : 1.0;
        for (int column = 0; column < options.width; ++column) {
            const double theta =
                rs2gen::IncidenceAngleDegrees(options, column) /
                degreesPerRadian;
            const double sigmaOverBeta = gains[1][column] / gains[0][column];
            EXPECT_NEAR(std::asin(std::pow(sigmaOverBeta, -power)), theta,
                        1e-5);
            EXPECT_NEAR(std::pow(gains[2][column] / gains[1][column], power),
                        std::cos(theta), 1e-5);
        }
        const XmlDocument xml(product.productXml);
        const int nearColumn = c.farRangeFirst ? options.width - 1 : 0;
        EXPECT_NEAR(std::stod(xml.Text("incidenceAngleNearRange")),
                    rs2gen::IncidenceAngleDegrees(options, nearColumn), 1e-6);
        EXPECT_NEAR(std::stod(xml.Text("incidenceAngleFarRange")),
                    rs2gen::IncidenceAngleDegrees(options, options.width - 1 -
                                                               nearColumn),
                    1e-6);
        EXPECT_LT(std::stod(xml.Text("incidenceAngleNearRange")) + 1.0,
                  std::stod(xml.Text("incidenceAngleFarRange")));
    }
}

// ---- Geolocation --------------------------------------------------------

struct GridPoint {
    double pixel, line, latitude, longitude, height;
};

std::vector<GridPoint> GridOf(const XmlDocument &xml) {
    const auto pixels = Numbers(xml.Texts("pixel"));
    const auto lines = Numbers(xml.Texts("line"));
    const auto latitudes = Numbers(xml.Texts("latitude"));
    const auto longitudes = Numbers(xml.Texts("longitude"));
    const auto heights = Numbers(xml.Texts("height"));
    std::vector<GridPoint> grid;
    for (size_t i = 0; i < pixels.size(); ++i)
        grid.push_back({pixels[i], lines.at(i), latitudes.at(i),
                        longitudes.at(i), heights.at(i)});
    return grid;
}

TEST(ProductGenerator, grid_and_image_tie_points_mark_the_same_ground) {
    rs2test::TempDir folder;
    ProductOptions options = Options("SGC");
    options.width = 50;
    options.height = 31;
    options.tieGridColumns = 6;
    options.tieGridRows = 4;
    const auto product = GenerateProduct(folder.Path(), options);
    const std::vector<GridPoint> grid = GridOf(XmlDocument(product.productXml));
    ASSERT_EQ(grid.size(), 24u);
    EXPECT_EQ(grid.front().pixel, 0);
    EXPECT_EQ(grid.front().line, 0);
    EXPECT_EQ(grid.back().pixel, 49);
    EXPECT_EQ(grid.back().line, 30);

    const TiffReader tiff(product.imageFiles[0]);
    const std::vector<double> tiePoints = tiff.Array<double>(modelTiepointTag);
    ASSERT_EQ(tiePoints.size(), 6 * grid.size());
    for (size_t i = 0; i < grid.size(); ++i) {
        const double *point = &tiePoints[6 * i];
        EXPECT_EQ(point[0], grid[i].pixel + 0.5) << i;
        EXPECT_EQ(point[1], grid[i].line + 0.5) << i;
        EXPECT_NEAR(point[3], grid[i].longitude, 1e-12) << i;
        EXPECT_NEAR(point[4], grid[i].latitude, 1e-12) << i;
        EXPECT_NEAR(point[5], grid[i].height, 1e-9) << i;
    }
    // Geographic model (1024 = 2), WGS 84 (2048 = 4326).
    const std::vector<uint16_t> keys = tiff.Array<uint16_t>(geoKeyDirectoryTag);
    ASSERT_GE(keys.size(), 4u);
    bool geographic = false, wgs84 = false;
    for (size_t k = 4; k + 3 < keys.size(); k += 4) {
        geographic |= keys[k] == 1024 && keys[k + 3] == 2;
        wgs84 |= keys[k] == 2048 && keys[k + 3] == 4326;
    }
    EXPECT_TRUE(geographic);
    EXPECT_TRUE(wgs84);
}

// One image axis ("pixel" or "line") of the rational functions of a
// product.xml, evaluated at ground points.
class RationalFunctionAxis {
  public:
    RationalFunctionAxis(const XmlDocument &xml, const std::string &axis)
        : numerator(Numbers(Tokens(xml.Text(axis + "NumeratorCoefficients")))),
          denominator(
              Numbers(Tokens(xml.Text(axis + "DenominatorCoefficients")))) {
        auto number = [&](const std::string &tag) {
            return std::stod(xml.Text(tag));
        };
        offset = number(axis + "Offset");
        scale = number(axis + "Scale");
        int i = 0;
        for (const char *ground : {"longitude", "latitude", "height"}) {
            groundOffset[i] = number(ground + std::string("Offset"));
            groundScale[i++] = number(ground + std::string("Scale"));
        }
    }
    double At(const GridPoint &point) const {
        const double l = Normalised(point.longitude, 0);
        const double p = Normalised(point.latitude, 1);
        const double h = Normalised(point.height, 2);
        const double terms[20] = {1,         l,         p,         h,
                                  l * p,     l * h,     p * h,     l * l,
                                  p * p,     h * h,     p * l * h, l * l * l,
                                  l * p * p, l * h * h, l * l * p, p * p * p,
                                  p * h * h, l * l * h, p * p * h, h * h * h};
        double top = 0, bottom = 0;
        for (size_t i = 0; i < 20; ++i) {
            top += numerator.at(i) * terms[i];
            bottom += denominator.at(i) * terms[i];
        }
        return top / bottom * scale + offset;
    }
    double HeightCoefficient() const { return numerator.at(3); }

  private:
    double Normalised(double value, int i) const {
        return (value - groundOffset[i]) / groundScale[i];
    }

    std::vector<double> numerator, denominator;
    double offset = 0, scale = 0;
    double groundOffset[3] = {}, groundScale[3] = {};
};

TEST(ProductGenerator, rational_functions_map_the_grid_to_its_image_positions) {
    for (const char *type : {"SLC", "SCW"})
        for (bool decreasing : {false, true}) {
            SCOPED_TRACE(std::string(type) + (decreasing ? " decreasing" : ""));
            rs2test::TempDir folder;
            ProductOptions options = Options(type);
            options.lineTimeDecreasing = decreasing;
            options.pixelTimeDecreasing = decreasing;
            const XmlDocument xml(
                GenerateProduct(folder.Path(), options).productXml);
            const RationalFunctionAxis pixel(xml, "pixel"), line(xml, "line");
            for (const GridPoint &point : GridOf(xml)) {
                EXPECT_NEAR(pixel.At(point), point.pixel, 1e-3);
                EXPECT_NEAR(line.At(point), point.line, 1e-3);
            }
            // Raised terrain shows toward near range (layover).
            EXPECT_EQ(pixel.HeightCoefficient() > 0, decreasing);
            EXPECT_EQ(line.HeightCoefficient(), 0.0);
        }
}

TEST(ProductGenerator,
     ascending_right_looking_pass_follows_the_time_orderings) {
    for (bool linesDecreasing : {false, true})
        for (bool pixelsDecreasing : {false, true}) {
            SCOPED_TRACE(std::to_string(linesDecreasing) +
                         std::to_string(pixelsDecreasing));
            rs2test::TempDir folder;
            ProductOptions options = Options("SGF");
            options.lineTimeDecreasing = linesDecreasing;
            options.pixelTimeDecreasing = pixelsDecreasing;
            const XmlDocument xml(
                GenerateProduct(folder.Path(), options).productXml);
            EXPECT_EQ(xml.Text("lineTimeOrdering"),
                      linesDecreasing ? "Decreasing" : "Increasing");
            EXPECT_EQ(xml.Text("pixelTimeOrdering"),
                      pixelsDecreasing ? "Decreasing" : "Increasing");
            // Fixed-width time texts compare like the times they denote.
            const std::string first = xml.Text("zeroDopplerTimeFirstLine");
            const std::string last = xml.Text("zeroDopplerTimeLastLine");
            EXPECT_EQ(first > last, linesDecreasing) << first << " " << last;
            const std::vector<GridPoint> grid = GridOf(xml);
            ASSERT_EQ(grid.size(), 121u);
            const GridPoint &origin = grid[0];
            const GridPoint &alongLine = grid[10];    // last pixel, line 0
            const GridPoint &alongColumn = grid[110]; // pixel 0, last line
            // Northward flight: later lines lie north; the radar looks right,
            // so far range lies east.
            EXPECT_EQ(alongColumn.latitude > origin.latitude, !linesDecreasing);
            EXPECT_EQ(alongLine.longitude > origin.longitude,
                      !pixelsDecreasing);
            const double centreLatitude =
                0.5 * (grid[0].latitude + grid[120].latitude);
            EXPECT_NEAR(centreLatitude, options.centerLatitude, 1e-6);
        }
}

TEST(ProductGenerator, orbit_is_a_low_earth_orbit_spanning_the_acquisition) {
    rs2test::TempDir folder;
    const XmlDocument xml(
        GenerateProduct(folder.Path(), Options("SGF")).productXml);
    const auto x = Numbers(xml.Texts("xPosition"));
    const auto y = Numbers(xml.Texts("yPosition"));
    const auto z = Numbers(xml.Texts("zPosition"));
    const auto vx = Numbers(xml.Texts("xVelocity"));
    const auto vy = Numbers(xml.Texts("yVelocity"));
    const auto vz = Numbers(xml.Texts("zVelocity"));
    ASSERT_EQ(x.size(), 5u);
    for (size_t i = 0; i < x.size(); ++i) {
        const double radius =
            std::sqrt(x[i] * x[i] + y[i] * y[i] + z[i] * z[i]);
        EXPECT_NEAR(radius, 6.366e6 + 7.98e5, 3e4);
        EXPECT_NEAR(std::sqrt(vx[i] * vx[i] + vy[i] * vy[i] + vz[i] * vz[i]),
                    7450.0, 1.0);
        // Ascending: moving north.
        EXPECT_GT(vz[i], 0);
    }
    // State vectors and attitude samples share their time stamps, which
    // bracket the line times.
    const auto stamps = xml.Texts("timeStamp");
    ASSERT_EQ(stamps.size(), 10u);
    EXPECT_LT(stamps[0], xml.Text("zeroDopplerTimeFirstLine"));
    EXPECT_GT(stamps[4], xml.Text("zeroDopplerTimeLastLine"));
    for (size_t i = 0; i < 5; ++i)
        EXPECT_EQ(stamps[i], stamps[i + 5]);
}

// ---- Refusals -----------------------------------------------------------

TEST(ProductGenerator, invalid_options_are_refused_before_writing) {
    struct Case {
        const char *name;
        void (*change)(ProductOptions &);
    };
    const Case cases[] = {
        {"zero width", [](ProductOptions &o) { o.width = 0; }},
        {"negative height", [](ProductOptions &o) { o.height = -1; }},
        {"slash in polarization",
         [](ProductOptions &o) { o.polarizations = {"H/H"}; }},
        {"empty tie grid", [](ProductOptions &o) { o.tieGridColumns = 0; }},
        {"huge tie grid", [](ProductOptions &o) { o.tieGridRows = 101; }},
        {"polar scene", [](ProductOptions &o) { o.centerLatitude = 89.0; }},
        {"longitude", [](ProductOptions &o) { o.centerLongitude = 200.0; }},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.name);
        rs2test::TempDir folder;
        ProductOptions options;
        c.change(options);
        EXPECT_THROW(GenerateProduct(folder.File("product"), options),
                     std::runtime_error);
        EXPECT_FALSE(fs::exists(folder.File("product")));
    }
    EXPECT_THROW(GenerateProduct("", ProductOptions()), std::runtime_error);
}

TEST(ProductGenerator, unwritable_folder_is_reported_with_its_name) {
    rs2test::TempDir folder;
    std::ofstream(folder.File("occupied")) << "a file, not a folder";
    try {
        GenerateProduct(folder.File("occupied"), ProductOptions());
        FAIL() << "no exception";
    } catch (const std::runtime_error &error) {
        EXPECT_NE(std::string(error.what()).find(folder.File("occupied")),
                  std::string::npos)
            << error.what();
    }
}

TEST(ProductGenerator, truth_functions_refuse_what_the_product_lacks) {
    const ProductOptions options; // 64 x 48, one polarization
    EXPECT_THROW(rs2gen::DetectedSample(options, 1, 0, 0), std::out_of_range);
    EXPECT_THROW(rs2gen::DetectedSample(options, 0, 64, 0), std::out_of_range);
    EXPECT_THROW(rs2gen::ComplexSample(options, 0, 0, -1), std::out_of_range);
    EXPECT_THROW(rs2gen::LookupTableGains(options, "sigma"),
                 std::invalid_argument);
    EXPECT_THROW(rs2gen::LookupTableOffset(options, "Beta"),
                 std::invalid_argument);
}

} // namespace
