#include "tools/generator/ProductGenerator.hpp"
#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"

#include <gtest/gtest.h>
#include <tiffio.h>
#include <xercesc/dom/DOM.hpp>
#include <xercesc/parsers/XercesDOMParser.hpp>
#include <xercesc/sax/HandlerBase.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLString.hpp>

#include <cmath>
#include <cstdarg>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <regex>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

namespace {

using rs2gen::GenerateProduct;
using rs2gen::ProductOptions;
using rs2test::FileText;
namespace fs = std::filesystem;

constexpr double degreesPerRadian = 57.29577951308232;
// GeoTIFF tags, unknown to plain libtiff.
constexpr uint32_t modelTiepointTag = 33922;

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

    std::vector<uint16_t> Line(uint32_t y) const {
        std::vector<uint16_t> line(size_t(TIFFScanlineSize64(tiff)) / 2);
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

// A parsed XML file whose elements are looked up by tag anywhere in it, as
// the driver does. Malformed XML throws from the constructor.
class XmlDocument {
  public:
    explicit XmlDocument(const std::string &path) {
        parser.setErrorHandler(&throwOnFatalError);
        parser.parse(path.c_str());
    }
    std::vector<std::string> Texts(const std::string &tag) const {
        const std::unique_ptr<XMLCh, void (*)(XMLCh *)> wide(
            xercesc::XMLString::transcode(tag.c_str()),
            [](XMLCh *p) { xercesc::XMLString::release(&p); });
        const xercesc::DOMNodeList *nodes =
            parser.getDocument()->getElementsByTagName(wide.get());
        std::vector<std::string> texts;
        for (XMLSize_t i = 0; i < nodes->getLength(); ++i)
            texts.push_back(Narrow(nodes->item(i)->getTextContent()));
        return texts;
    }
    std::string Text(const std::string &tag) const {
        const std::vector<std::string> texts = Texts(tag);
        return texts.empty() ? "" : texts.front();
    }
    std::vector<double> Numbers(const std::string &tag) const {
        std::vector<double> numbers;
        for (const std::string &text : Texts(tag))
            numbers.push_back(std::strtod(text.c_str(), nullptr));
        return numbers;
    }

  private:
    // Up before the parser is made, down after it is gone.
    struct Platform {
        Platform() { xercesc::XMLPlatformUtils::Initialize(); }
        ~Platform() { xercesc::XMLPlatformUtils::Terminate(); }
    } platform;
    xercesc::HandlerBase throwOnFatalError;
    mutable xercesc::XercesDOMParser parser;
};

std::vector<double> SpacedNumbers(const std::string &text) {
    std::istringstream in(text);
    return {std::istream_iterator<double>(in), std::istream_iterator<double>()};
}

ProductOptions Options(const std::string &type,
                       std::vector<std::string> polarizations = {"HH"}) {
    ProductOptions options;
    options.productType = type;
    options.polarizations = std::move(polarizations);
    return options;
}

// The 16-bit words of line y of an image as the truth functions give them.
std::vector<uint16_t> TruthLine(const ProductOptions &options, int image,
                                int y) {
    std::vector<uint16_t> words;
    for (int x = 0; x < options.width; ++x) {
        if (options.productType != "SLC") {
            words.push_back(rs2gen::DetectedSample(options, image, x, y));
            continue;
        }
        const auto [i, q] = rs2gen::ComplexSample(options, image, x, y);
        words.push_back(uint16_t(i));
        words.push_back(uint16_t(q));
    }
    return words;
}

TEST(ProductGenerator, images_hold_the_truth_function_samples) {
    struct Case {
        const char *type;
        std::vector<std::string> polarizations;
        bool packBits;
    };
    const Case cases[] = {{"SGF", {"HH"}, false},
                          {"SCW", {"VV", "VH"}, true},
                          {"SLC", {"HH", "HV"}, false}};
    for (const Case &c : cases) {
        SCOPED_TRACE(c.type);
        rs2test::TempDir folder;
        ProductOptions options = Options(c.type, c.polarizations);
        options.width = 37; // odd sizes catch row-length mistakes
        options.height = 29;
        options.packBits = c.packBits;
        const bool complex = options.productType == "SLC";
        const auto product = GenerateProduct(folder.Path(), options);
        ASSERT_EQ(product.imageFiles.size(), c.polarizations.size());
        for (size_t p = 0; p < product.imageFiles.size(); ++p) {
            const TiffReader tiff(product.imageFiles[p]);
            ASSERT_TRUE(tiff.IsOpen()) << product.imageFiles[p];
            EXPECT_EQ(tiff.Field<uint32_t>(TIFFTAG_IMAGEWIDTH), 37u);
            EXPECT_EQ(tiff.Field<uint32_t>(TIFFTAG_IMAGELENGTH), 29u);
            EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_BITSPERSAMPLE), 16);
            EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_SAMPLESPERPIXEL),
                      complex ? 2 : 1);
            EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_SAMPLEFORMAT),
                      complex ? SAMPLEFORMAT_INT : SAMPLEFORMAT_UINT);
            EXPECT_EQ(tiff.Field<uint16_t>(TIFFTAG_COMPRESSION),
                      c.packBits ? COMPRESSION_PACKBITS : COMPRESSION_NONE);
            int mismatchedLines = 0;
            for (int y = 0; y < options.height; ++y)
                mismatchedLines +=
                    tiff.Line(y) != TruthLine(options, int(p), y);
            EXPECT_EQ(mismatchedLines, 0);
        }
    }
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
        EXPECT_EQ(FileText(entry.path().string()),
                  FileText(second.File(name.string())))
            << name;
        ++compared;
    }
    EXPECT_EQ(compared, 7); // product.xml, 3 tables, 2 images, side file
    EXPECT_NE(FileText(first.File("imagery_HH.tif")),
              FileText(third.File("imagery_HH.tif")));
    EXPECT_NE(FileText(first.File("imagery_VV.tif")),
              FileText(first.File("imagery_HH.tif")));
}

TEST(ProductGenerator, options_leave_out_exactly_their_parts) {
    struct Case {
        const char *name;
        void (*change)(ProductOptions &);
        bool luts, images, grid, imageTiePoints, rpc, sideFile;
    };
    // clang-format off
    const Case cases[] = {
        {"defaults", [](ProductOptions &) {}, true, true, true, true, true, false},
        {"no tables", [](ProductOptions &o) { o.lookupTables = false; }, false, true, true, true, true, false},
        {"no images", [](ProductOptions &o) { o.images = false; }, true, false, true, false, true, false},
        {"no rpc", [](ProductOptions &o) { o.rationalFunctions = false; }, true, true, true, true, false, false},
        {"no tie points", [](ProductOptions &o) { o.tiePoints = false; }, true, true, false, false, true, false},
        {"image tie points only", [](ProductOptions &o) { o.geolocationGrid = false; }, true, true, false, true, true, false},
        {"side file", [](ProductOptions &o) { o.sideFile = true; }, true, true, true, true, true, true},
    };
    // clang-format on
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
        EXPECT_EQ(xml.Texts("lookupTable"),
                  (std::vector<std::string>{"lutBeta.xml", "lutSigma.xml",
                                            "lutGamma.xml"}));
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

TEST(ProductGenerator, side_file_gives_the_acquisition_times_in_time_order) {
    rs2test::TempDir folder;
    ProductOptions options = Options("SCN", {"HH", "HV"});
    options.sideFile = true;
    options.lineTimeDecreasing = true;
    const XmlDocument xml(GenerateProduct(folder.Path(), options).productXml);
    const std::string side = FileText(folder.File("ProductDescription.self"));
    // Line 0 is the latest line of a product with decreasing line times.
    for (const auto &[key, tag] :
         {std::pair{"startTime", "zeroDopplerTimeLastLine"},
          std::pair{"endTime", "zeroDopplerTimeFirstLine"}})
        EXPECT_TRUE(std::regex_search(side, std::regex(std::string("\\b") +
                                                       key + " *= *" +
                                                       xml.Text(tag) + " *;")))
            << key;
}

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
            std::istringstream in(lut.Text("gains"));
            gains.emplace_back(std::istream_iterator<float>(in),
                               std::istream_iterator<float>());
            EXPECT_EQ(gains.back(), rs2gen::LookupTableGains(options, kind));
            EXPECT_EQ(std::strtof(lut.Text("offset").c_str(), nullptr),
                      c.offset);
            EXPECT_EQ(rs2gen::LookupTableOffset(options, kind), c.offset);
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
        const int near = c.farRangeFirst ? options.width - 1 : 0;
        EXPECT_NEAR(std::stod(xml.Text("incidenceAngleNearRange")),
                    rs2gen::IncidenceAngleDegrees(options, near), 1e-6);
        EXPECT_NEAR(
            std::stod(xml.Text("incidenceAngleFarRange")),
            rs2gen::IncidenceAngleDegrees(options, options.width - 1 - near),
            1e-6);
    }
}

struct GridPoint {
    double pixel, line, latitude, longitude, height;
};

std::vector<GridPoint> GridOf(const XmlDocument &xml) {
    const auto pixels = xml.Numbers("pixel"), lines = xml.Numbers("line");
    const auto latitudes = xml.Numbers("latitude");
    const auto longitudes = xml.Numbers("longitude");
    const auto heights = xml.Numbers("height");
    std::vector<GridPoint> grid;
    for (size_t i = 0; i < pixels.size(); ++i)
        grid.push_back({pixels[i], lines.at(i), latitudes.at(i),
                        longitudes.at(i), heights.at(i)});
    return grid;
}

// That the GeoTIFF's tie points mark the ground of the grid in product.xml
// is checked through the host in GeoreferencingTest.

// One image axis ("pixel" or "line") of the rational functions of a
// product.xml, evaluated at ground points.
class RationalFunctionAxis {
  public:
    RationalFunctionAxis(const XmlDocument &xml, const std::string &axis)
        : numerator(SpacedNumbers(xml.Text(axis + "NumeratorCoefficients"))),
          denominator(
              SpacedNumbers(xml.Text(axis + "DenominatorCoefficients"))) {
        auto number = [&](const std::string &tag) {
            return std::stod(xml.Text(tag));
        };
        offset = number(axis + "Offset");
        scale = number(axis + "Scale");
        int i = 0;
        for (const std::string ground : {"longitude", "latitude", "height"}) {
            groundOffset[i] = number(ground + "Offset");
            groundScale[i++] = number(ground + "Scale");
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

TEST(ProductGenerator, grid_and_rational_functions_follow_the_time_orderings) {
    struct Case {
        const char *type;
        bool linesDecreasing, pixelsDecreasing;
    };
    for (const Case &c : {Case{"SLC", false, false}, Case{"SCW", true, false},
                          Case{"SLC", false, true}, Case{"SCW", true, true}}) {
        SCOPED_TRACE(std::string(c.type) + std::to_string(c.linesDecreasing) +
                     std::to_string(c.pixelsDecreasing));
        rs2test::TempDir folder;
        ProductOptions options = Options(c.type);
        options.lineTimeDecreasing = c.linesDecreasing;
        options.pixelTimeDecreasing = c.pixelsDecreasing;
        const XmlDocument xml(
            GenerateProduct(folder.Path(), options).productXml);
        auto ordering = [](bool decreasing) {
            return decreasing ? "Decreasing" : "Increasing";
        };
        EXPECT_EQ(xml.Text("lineTimeOrdering"), ordering(c.linesDecreasing));
        EXPECT_EQ(xml.Text("pixelTimeOrdering"), ordering(c.pixelsDecreasing));
        // Fixed-width time texts compare like the times they denote.
        EXPECT_EQ(xml.Text("zeroDopplerTimeFirstLine") >
                      xml.Text("zeroDopplerTimeLastLine"),
                  c.linesDecreasing);
        const std::vector<GridPoint> grid = GridOf(xml);
        ASSERT_EQ(grid.size(), 121u);
        // Northward flight: later lines lie north; the radar looks right, so
        // far range lies east.
        EXPECT_EQ(grid[110].latitude > grid[0].latitude, !c.linesDecreasing);
        EXPECT_EQ(grid[10].longitude > grid[0].longitude, !c.pixelsDecreasing);
        const RationalFunctionAxis pixel(xml, "pixel"), line(xml, "line");
        for (const GridPoint &point : grid) {
            EXPECT_NEAR(pixel.At(point), point.pixel, 1e-3);
            EXPECT_NEAR(line.At(point), point.line, 1e-3);
        }
        // The grid lies at one height, so only the sign of the height term
        // shows that raised terrain moves toward near range.
        EXPECT_EQ(pixel.HeightCoefficient() > 0, c.pixelsDecreasing);
        EXPECT_EQ(line.HeightCoefficient(), 0.0);
    }
}

TEST(ProductGenerator, invalid_options_are_refused_before_writing) {
    struct Case {
        const char *name;
        void (*change)(ProductOptions &);
    };
    // clang-format off
    const Case cases[] = {
        {"zero width", [](ProductOptions &o) { o.width = 0; }},
        {"negative height", [](ProductOptions &o) { o.height = -1; }},
        {"slash in polarization", [](ProductOptions &o) { o.polarizations = {"H/H"}; }},
        {"empty tie grid", [](ProductOptions &o) { o.tieGridColumns = 0; }},
        {"huge tie grid", [](ProductOptions &o) { o.tieGridRows = 101; }},
        {"polar scene", [](ProductOptions &o) { o.centerLatitude = 89.0; }},
        {"longitude", [](ProductOptions &o) { o.centerLongitude = 200.0; }},
    };
    // clang-format on
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

} // namespace
