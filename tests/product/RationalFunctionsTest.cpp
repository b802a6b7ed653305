#include "product/RationalFunctions.hpp"

#include "model/ProductVariants.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"
#include "tools/generator/ProductGenerator.hpp"
#include "tools/generator/RationalFunctions.hpp"
#include "tools/generator/SceneGeometry.hpp"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace {

// A product description holding only what the rational function reader
// looks at, parsed from a file of its own.
class SmallDocument {
  public:
    explicit SmallDocument(const std::string &rationalFunctions)
        : parse(rs2test::WriteFile(
                    dir.File("product.xml"),
                    "<product><sourceAttributes><satellite>RADARSAT-3"
                    "</satellite></sourceAttributes>" +
                        rationalFunctions + "</product>")
                    .c_str()) {}
    const xercesc::DOMDocument *Document() const { return parse.Document(); }

  private:
    rs2test::TempDir dir;
    DocumentParse parse;
};

std::string Numbers(int first, int count) {
    std::ostringstream text;
    for (int i = 0; i < count; ++i)
        text << (i ? " " : "") << first + i;
    return text.str();
}

std::string Element(const std::string &tag, const std::string &text) {
    return "<" + tag + ">" + text + "</" + tag + ">";
}

std::vector<double> Values(const double *array, int count) {
    return std::vector<double>(array, array + count);
}

std::vector<double> Expected(std::vector<double> head, size_t size = 20) {
    head.resize(size, 0.0);
    return head;
}

std::vector<double> Sequence(int first, int count) {
    std::vector<double> values;
    for (int i = 0; i < count; ++i)
        values.push_back(first + i);
    return values;
}

RFInfo_t *ReadFrom(ProductReader &reader, const SmallDocument &document) {
    RUZ2GrpcCR model; // no image: width and height 0
    ReadRationalFunctions(reader, document.Document(), &model);
    return reader.rationalFunctions;
}

} // namespace

TEST(ReadRationalFunctions, fills_each_polynomial_with_twenty_pieces_at_most) {
    const SmallDocument document(Element(
        "rationalFunctions",
        Element("lineNumeratorCoefficients", Numbers(100, 20)) +
            Element("lineDenominatorCoefficients", Numbers(200, 20)) +
            Element("pixelNumeratorCoefficients", Numbers(300, 25)) +
            Element("pixelDenominatorCoefficients", " " + Numbers(400, 20))));
    ProductReader reader;
    const RFInfo_t *record = ReadFrom(reader, document);
    ASSERT_NE(record, nullptr);
    ASSERT_EQ(record->coefficientCount, 20);
    EXPECT_EQ(Values(record->lineNumeratorCoefficients, 20), Sequence(100, 20));
    EXPECT_EQ(Values(record->lineDenominatorCoefficients, 20),
              Sequence(200, 20));
    EXPECT_EQ(Values(record->pixelNumeratorCoefficients, 20),
              Sequence(300, 20));
    // The leading space shifts every value up; the last one falls off.
    std::vector<double> shifted = Sequence(400, 19);
    shifted.insert(shifted.begin(), 0.0);
    EXPECT_EQ(Values(record->pixelDenominatorCoefficients, 20), shifted);
    EXPECT_STREQ(record->sensorName, "RADARSAT-2");
    EXPECT_EQ(record->width, 0);
    EXPECT_EQ(record->height, 0);
}

TEST(ReadRationalFunctions, stores_a_zero_for_every_empty_piece) {
    struct Case {
        const char *text;
        std::vector<double> expected;
    } cases[] = {
        {"1 2 3", Expected({1, 2, 3})},
        {"1  2 3", Expected({1, 0, 2, 3})},
        {" 1 2", Expected({0, 1, 2})},
        {"1 2 ", Expected({1, 2, 0})},
        {"1   2", Expected({1, 0, 0, 2})},
        {"1 abc 2.5e1", Expected({1, 0, 25})},
        {"-1.5e-3 7", Expected({-1.5e-3, 7})},
    };
    for (const Case &c : cases) {
        const SmallDocument document(Element(
            "rationalFunctions", Element("lineNumeratorCoefficients", c.text)));
        ProductReader reader;
        const RFInfo_t *record = ReadFrom(reader, document);
        ASSERT_NE(record, nullptr) << c.text;
        EXPECT_EQ(Values(record->lineNumeratorCoefficients, 20), c.expected)
            << "\"" << c.text << "\"";
    }
}

TEST(ReadRationalFunctions,
     reads_the_scales_and_offsets_and_keeps_missing_ones) {
    const SmallDocument document(Element(
        "rationalFunctions",
        Element("lineOffset", "15232") + Element("pixelOffset", "9232") +
            Element("latitudeOffset", "-2.6471e+01") +
            Element("longitudeOffset", "1.487074e+02") +
            Element("lineScale", "15233") + Element("pixelScale", "9233") +
            Element("latitudeScale", "8.536e-01") +
            Element("longitudeScale", "") + Element("heightScale", "7.01e2")));
    ProductReader reader;
    const RFInfo_t *record = ReadFrom(reader, document);
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(record->lineOffset, 15232.0);
    EXPECT_EQ(record->pixelOffset, 9232.0);
    EXPECT_EQ(record->latitudeOffset, -26.471);
    EXPECT_EQ(record->longitudeOffset, 148.7074);
    EXPECT_EQ(record->heightOffset, 0.0); // absent: as allocated
    EXPECT_EQ(record->lineScale, 15233.0);
    EXPECT_EQ(record->pixelScale, 9233.0);
    EXPECT_EQ(record->latitudeScale, 0.8536);
    EXPECT_EQ(record->longitudeScale, 1.0); // empty: as allocated
    EXPECT_EQ(record->heightScale, 701.0);
    EXPECT_EQ(Values(record->lineNumeratorCoefficients, 20), Expected({}));
}

TEST(ReadRationalFunctions, keeps_no_record_without_rational_functions_text) {
    const char *documents[] = {
        "",                                        // no element at all
        "<rationalFunctions></rationalFunctions>", // an element without text
        "<rationalFunctions/>",
    };
    for (const char *text : documents) {
        const SmallDocument document(text);
        ProductReader reader;
        EXPECT_EQ(ReadFrom(reader, document), nullptr) << text;
    }
}

TEST(ReadRationalFunctions, reads_the_record_only_once_per_reader) {
    const SmallDocument first(Element(
        "rationalFunctions", Element("lineOffset", "10") +
                                 Element("lineNumeratorCoefficients", "1 2")));
    const SmallDocument second(Element(
        "rationalFunctions", Element("lineOffset", "20") +
                                 Element("lineNumeratorCoefficients", "3 4")));
    ProductReader reader;
    const RFInfo_t *record = ReadFrom(reader, first);
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(ReadFrom(reader, second), record);
    EXPECT_EQ(record->lineOffset, 10.0);
    EXPECT_EQ(Values(record->lineNumeratorCoefficients, 20), Expected({1, 2}));
}

TEST(ReadRationalFunctions, loads_the_model_of_a_generated_product) {
    rs2test::TempDir folder;
    rs2gen::ProductOptions options;
    options.width = 80;
    options.height = 60;
    const rs2gen::GeneratedProduct product =
        rs2gen::GenerateProduct(folder.Path(), options);
    const rs2gen::RationalFunctionModel truth =
        rs2gen::RationalFunctionsOf(rs2gen::SceneGeometry(options));

    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model(
        LoadProduct(reader, product.productXml.c_str(), ""));
    ASSERT_NE(model, nullptr);
    const RFInfo_t *record = reader.rationalFunctions;
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(record->width, 80);
    EXPECT_EQ(record->height, 60);
    EXPECT_STREQ(record->sensorName, "RADARSAT-2");

    const std::pair<double, double> scalars[] = {
        {record->lineOffset, truth.lineOffset},
        {record->pixelScale, truth.pixelScale},
        {record->latitudeOffset, truth.latitudeOffset},
        {record->longitudeScale, truth.longitudeScale},
        {record->heightOffset, truth.heightOffset}};
    for (const auto &[actual, expected] : scalars)
        EXPECT_NEAR(actual, expected, 1e-12 * (1 + std::fabs(expected)));
    const std::pair<const double *, const std::array<double, 20> *> arrays[] = {
        {record->lineNumeratorCoefficients, &truth.lineNumerator},
        {record->lineDenominatorCoefficients, &truth.lineDenominator},
        {record->pixelNumeratorCoefficients, &truth.pixelNumerator},
        {record->pixelDenominatorCoefficients, &truth.pixelDenominator},
    };
    for (const auto &[actual, expected] : arrays)
        for (int i = 0; i < 20; ++i)
            EXPECT_NEAR(actual[i], (*expected)[i],
                        1e-12 * (1 + std::fabs((*expected)[i])))
                << i;
}
