#include "product/MetadataExtraction.hpp"

#include "host/TextServices.hpp"
#include "model/ProductVariants.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/HostLists.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace {

using rs2test::ListEntry;

const char *const kRealProduct =
    RS2_SOURCE_DIR "/../shared/realdata/rs2_slc_f0w2_hh_20170430/product.xml";

std::vector<std::string> Fields(const std::string &text) {
    std::vector<std::string> fields = SplitTokens(text, ";");
    // Every field is followed by ';', so the split leaves one empty tail.
    EXPECT_EQ(fields.back(), "");
    fields.pop_back();
    return fields;
}

// A product description written into its own folder and run through the
// extraction into a model; the metadata and tie points stay with the model.
class Extraction {
  public:
    explicit Extraction(const std::string &productBody,
                        const std::string &sideFile = std::string()) {
        const std::string path = rs2test::WriteFile(
            dir.File("product.xml"), "<?xml version=\"1.0\"?>\n<product>" +
                                         productBody + "</product>\n");
        if (!sideFile.empty())
            rs2test::WriteFile(dir.File("ProductDescription.self"), sideFile);
        reader.productPath = HString(path.c_str());
        DocumentParse parse(path.c_str());
        EXPECT_NE(parse.Document(), nullptr);
        ExtractProductMetadata(reader, parse.Document(), &model);
    }

    std::optional<std::string> Value(const char *key) const {
        return ListEntry(model.GetMetadata(), key);
    }
    const ZirOdi2CalibImage &Model() const { return model; }

  private:
    rs2test::TempDir dir;
    ProductReader reader;
    ZirOdi2SLC model;
};

std::string ProductTypeElement(const std::string &type) {
    return "<productType>" + type + "</productType>";
}

TEST(MetadataExtraction, source_entries_are_copied_when_present) {
    Extraction extraction("<productId>PDS_1</productId>"
                          "<beamModeMnemonic>F0W2</beamModeMnemonic>"
                          "<acquisitionType>Fine</acquisitionType>"
                          "<passDirection>Ascending</passDirection>"
                          "<antennaPointing>Right</antennaPointing>"
                          "<pulseRepetitionFrequency>1328.8"
                          "</pulseRepetitionFrequency>"
                          "<satelliteHeight>802440</satelliteHeight>");
    const std::pair<const char *, const char *> entries[] = {
        {"PlatformName", "RADARSAT-2"},
        {"productId", "PDS_1"},
        {"SourceID", "PDS_1"},
        {"BeamMode", "F0W2"},
        {"Acquisition_Type", "Fine"},
        {"OrbitDirection", "Ascending"},
        {"passDirection", "Ascending"},
        {"LookDirection", "Right"},
        {"PulseRepetitionFrequency", "1328.8"},
        {"SatelliteAltitude", "802440"},
    };
    for (const auto &[key, value] : entries)
        EXPECT_EQ(extraction.Value(key), value) << key;
    EXPECT_EQ(extraction.Value("antennaPointing"), std::nullopt);

    // An empty element counts as missing; the look direction is always set.
    Extraction empty("<beamModeMnemonic></beamModeMnemonic>");
    EXPECT_EQ(empty.Value("BeamMode"), std::nullopt);
    EXPECT_EQ(empty.Value("LookDirection"), "");
    EXPECT_EQ(empty.Value("antennaPointing"), std::nullopt);
    EXPECT_EQ(empty.Value("PlatformName"), "RADARSAT-2");
}

TEST(MetadataExtraction, numbers_are_rewritten_in_fixed_formats) {
    Extraction extraction(
        "<rasterAttributes><sampledPixelSpacing>1.250000e+01"
        "</sampledPixelSpacing><sampledLineSpacing>5.05070305e+00"
        "</sampledLineSpacing><numberOfLines>48</numberOfLines>"
        "<NumberOfSamplesPerLine>64</NumberOfSamplesPerLine>"
        "<dataType>Magnitude Detected</dataType></rasterAttributes>"
        "<sarProcessingInformation><slantRangeNearEdge>8.35162041e+05"
        "</slantRangeNearEdge><incidenceAngleNearRange>30.7"
        "</incidenceAngleNearRange><incidenceAngleFarRange>39.5"
        "</incidenceAngleFarRange></sarProcessingInformation>");
    EXPECT_EQ(extraction.Value("SpatialResolutionX"), "12.500");
    EXPECT_EQ(extraction.Value("SpatialResolutionY"), "5.051");
    EXPECT_EQ(extraction.Value("SlantRangeNearEdge"), "835162.0410");
    EXPECT_EQ(extraction.Value("RowCount"), "48");
    // Child names are matched without regard to case.
    EXPECT_EQ(extraction.Value("ColumnCount"), "64");
    EXPECT_EQ(extraction.Value("dataType"), "Magnitude Detected");
    EXPECT_EQ(extraction.Value("IncidenceNearAngle"), "30.7");
    EXPECT_EQ(extraction.Value("IncidenceFarAngle"), "39.5");
    EXPECT_EQ(extraction.Value("sampledPixelSpacing"), std::nullopt);
}

TEST(MetadataExtraction, wavelength_needs_a_nonzero_frequency) {
    struct Case {
        const char *body;
        std::optional<std::string> frequency;
        std::optional<std::string> wavelength;
    };
    const Case cases[] = {
        {"<radarCenterFrequency>5.405000454334350e+09</radarCenterFrequency>",
         "5.405000454334350e+09", "0.0554658"},
        {"<radarCenterFrequency>0</radarCenterFrequency>", "0", std::nullopt},
        {"<productId>no frequency</productId>", std::nullopt, std::nullopt},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.body);
        Extraction extraction(c.body);
        EXPECT_EQ(extraction.Value("RadarCenterFrequency"), c.frequency);
        EXPECT_EQ(extraction.Value("RadarCenterWavelength"), c.wavelength);
    }
}

TEST(MetadataExtraction, processing_groups_leave_out_windows_and_looks) {
    Extraction extraction(
        "<sarProcessingInformation>"
        "<azimuthWindow><windowName>Kaiser</windowName></azimuthWindow>"
        "<rangeWindow><windowName>Kaiser</windowName></rangeWindow>"
        "<numberOfRangeLooks>1</numberOfRangeLooks>"
        "<NUMBEROFAZIMUTHLOOKS>4</NUMBEROFAZIMUTHLOOKS>"
        "<numberOfLinesProcessed>31142</numberOfLinesProcessed>"
        "<lutApplied>Point Target</lutApplied>"
        "<!--kept-->"
        "</sarProcessingInformation>");
    for (const char *key :
         {"azimuthWindow", "rangeWindow", "windowName", "numberOfRangeLooks",
          "NUMBEROFAZIMUTHLOOKS", "numberOfLinesProcessed"})
        EXPECT_EQ(extraction.Value(key), std::nullopt) << key;
    EXPECT_EQ(extraction.Value("lutApplied"), "Point Target");
    // A comment is a child node too and keeps the parser's name for it.
    EXPECT_EQ(extraction.Value("#comment"), "kept");
}

TEST(MetadataExtraction, only_the_first_doppler_centroid_counts) {
    Extraction extraction(
        "<dopplerCentroid><dopplerCentroidCoefficients>1 2 3"
        "</dopplerCentroidCoefficients><dopplerCentroidReferenceTime>0.006"
        "</dopplerCentroidReferenceTime><dopplerAmbiguity>0</dopplerAmbiguity>"
        "</dopplerCentroid>"
        "<dopplerCentroid><dopplerCentroidCoefficients>4 5 6"
        "</dopplerCentroidCoefficients><extra>x</extra></dopplerCentroid>"
        "<referenceEllipsoidParameters><ellipsoidName>WGS 1984</ellipsoidName>"
        "<semiMajorAxis>6378137</semiMajorAxis><semiMinorAxis>6356752"
        "</semiMinorAxis><geodeticTerrainHeight>370.2</geodeticTerrainHeight>"
        "</referenceEllipsoidParameters>");
    EXPECT_EQ(extraction.Value("DopplerCentroidCoefficients"), "1 2 3");
    EXPECT_EQ(extraction.Value("DopplerCentroidReferenceTime"), "0.006");
    EXPECT_EQ(extraction.Value("dopplerAmbiguity"), "0");
    EXPECT_EQ(extraction.Value("extra"), std::nullopt);
    EXPECT_EQ(extraction.Value("EllipsoidName"), "WGS 1984");
    EXPECT_EQ(extraction.Value("SemiMajorAxis"), "6378137");
    EXPECT_EQ(extraction.Value("SemiMinorAxis"), "6356752");
    EXPECT_EQ(extraction.Value("NominalLocation_Height"), "370.2");
}

TEST(MetadataExtraction, acquisition_time_is_the_middle_of_the_line_times) {
    struct Case {
        const char *comment;
        const char *rawStart;
        const char *firstLine;
        const char *lastLine;
        std::optional<std::string> expected;
    };
    const Case cases[] = {
        {"fraction kept", "2010-05-08T11:59:58.000000Z",
         "2010-05-08T12:00:00.000000Z", "2010-05-08T12:00:10.500000Z",
         "2010-05-08T12:00:05.25Z"},
        {"every zero of the fraction removed", "2010-05-08T11:59:58.000000Z",
         "2010-05-08T12:00:00.000000Z", "2010-05-08T12:00:10.000000Z",
         "2010-05-08T12:00:05.Z"},
        {"decreasing line times", "2017-04-30T08:42:53.511963Z",
         "2017-04-30T08:43:16.790276Z", "2017-04-30T08:42:54.790276Z",
         "2017-04-30T08:43:05.790276Z"},
        {"last line missing", "2010-05-08T11:59:58.000000Z",
         "2010-05-08T12:00:00.000000Z", nullptr, std::nullopt},
        {"first line at midnight", "2010-05-08T00:00:00.000000Z",
         "2010-05-08T00:00:00.000000Z", "2010-05-08T00:00:10.000000Z",
         std::nullopt},
        {"date only, no time of day", "2010-05-08T11:59:58.000000Z",
         "2010-05-08", "2010-05-08T12:00:10.000000Z", std::nullopt},
        {"two clock pieces", "2010-05-08T11:59:58.000000Z", "2010-05-08T12:00",
         "2010-05-08T12:00:10.000000Z", std::nullopt},
        {"no raw data start time", nullptr, "2010-05-08T12:00:00.000000Z",
         "2010-05-08T12:00:10.000000Z", std::nullopt},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.comment);
        std::string body;
        if (c.rawStart != nullptr)
            body += std::string("<rawDataStartTime>") + c.rawStart +
                    "</rawDataStartTime>";
        body += std::string("<zeroDopplerTimeFirstLine>") + c.firstLine +
                "</zeroDopplerTimeFirstLine>";
        if (c.lastLine != nullptr)
            body += std::string("<zeroDopplerTimeLastLine>") + c.lastLine +
                    "</zeroDopplerTimeLastLine>";
        Extraction extraction(body);
        EXPECT_EQ(extraction.Value("Acquisition_DateTime"), c.expected);
        // The line times themselves are kept as written.
        EXPECT_EQ(extraction.Value("TimeOfFirstLine"), c.firstLine);
    }
}

TEST(MetadataExtraction, seconds_of_day_read_the_clock_after_the_date) {
    struct Case {
        const char *text;
        double seconds;
    };
    const Case cases[] = {
        {"2010-05-08T12:00:01.500000Z", 43201.5},
        {"2017-04-30T08:42:53.864993Z", 31373.864993},
        {"2010-05-08T23:59:59.999999Z", 86399.999999},
        {"2010-05-08T00:00:00.000000Z", 0.0},
        {"2010-05-08T12:00", 0.0}, // two clock pieces: no time of day
        {"2010-05-08", 0.0},       // date only
        {"", 0.0},
        {nullptr, 0.0},
        // Clock fields beyond the int range are clamped, never overflowed.
        {"2010-05-08T99999999999999:00:00Z", 2147483647.0 * 3600.0},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.text != nullptr ? c.text : "(null)");
        EXPECT_NEAR(SecondsOfDay(c.text), c.seconds, 1e-6);
    }
}

const char *const kRangeGeometry =
    "<rasterAttributes><numberOfSamplesPerLine>%d</numberOfSamplesPerLine>"
    "<sampledPixelSpacing>2.5</sampledPixelSpacing>"
    "<pixelTimeOrdering>%s</pixelTimeOrdering></rasterAttributes>"
    "<sarProcessingInformation><slantRangeNearEdge>800000"
    "</slantRangeNearEdge></sarProcessingInformation>"
    "<slantRangeToGroundRange><groundRangeOrigin>%s</groundRangeOrigin>"
    "%s</slantRangeToGroundRange>";

std::string RangeGeometry(const std::string &type, const char *pixelOrder,
                          const char *origin, const char *coefficients,
                          int samples = 101) {
    return ProductTypeElement(type) +
           MkName(kRangeGeometry, samples, pixelOrder, origin, coefficients);
}

std::string SlantPolynomial(const char *coefficients, const char *origin) {
    return RangeGeometry("SGF", "Increasing", origin,
                         MkName("<groundToSlantRangeCoefficients>%s"
                                "</groundToSlantRangeCoefficients>",
                                coefficients));
}

TEST(MetadataExtraction, far_edge_follows_the_product_geometry) {
    struct Case {
        const char *comment;
        std::string body;
        std::optional<std::string> farEdge;
    };
    const Case cases[] = {
        {"slant range product: near edge plus the line length",
         RangeGeometry("SLC", "Increasing", "0", ""), "800250.0000"},
        {"a single column: the far edge is the near edge",
         RangeGeometry("SLC", "Increasing", "0", "", 1), "800000.0000"},
        // g = 100 * 2.5 - 50 = 200: 1000 + 2 * 200 + 0.5 * 200^2
        {"ground range product: the polynomial at the line's end",
         SlantPolynomial("1000 2 0.5 0 0 0", "50"), "21400.0000"},
        {"every coefficient counts", SlantPolynomial("0 0 0 0 0 2e-10", "0"),
         "195.3125"}, // 250^5 * 2e-10
        {"five coefficients: the sixth is 0",
         SlantPolynomial("0 0 0 0 1e-8", "0"), "39.0625"}, // 250^4 * 1e-8
        {"numbers up to the first text that is none",
         SlantPolynomial("1000 2 x 7", "50"), "1400.0000"}, // 1000 + 2 * 200
        {"no number at all", SlantPolynomial("none", "0"), std::nullopt},
        {"ground range product without a polynomial",
         RangeGeometry("SGF", "Increasing", "0", ""), std::nullopt},
        {"no ground range origin",
         ProductTypeElement("SLC") +
             "<rasterAttributes><numberOfSamplesPerLine>101"
             "</numberOfSamplesPerLine><sampledPixelSpacing>2.5"
             "</sampledPixelSpacing></rasterAttributes>"
             "<sarProcessingInformation><slantRangeNearEdge>800000"
             "</slantRangeNearEdge></sarProcessingInformation>",
         std::nullopt},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.comment);
        EXPECT_EQ(Extraction(c.body).Value("SlantRangeFarEdge"), c.farEdge);
    }
}

TEST(MetadataExtraction, range_distances_follow_the_pixel_order) {
    struct Case {
        const char *comment;
        std::string body;
        std::optional<std::string> first;
        std::optional<std::string> last;
    };
    const Case cases[] = {
        {"near range first", RangeGeometry("SLC", "Increasing", "0", ""),
         "800000.0000", "800250.0000"},
        {"far range first", RangeGeometry("SLC", "Decreasing", "0", ""),
         "800250.0000", "800000.0000"},
        {"no far edge: only the near side",
         RangeGeometry("SGF", "Increasing", "0", ""), "800000.0000",
         std::nullopt},
        {"no far edge, flipped", RangeGeometry("SGF", "Decreasing", "0", ""),
         std::nullopt, "800000.0000"},
        {"no pixel order: no distances",
         ProductTypeElement("SLC") +
             "<sarProcessingInformation><slantRangeNearEdge>"
             "800000</slantRangeNearEdge>"
             "</sarProcessingInformation>",
         std::nullopt, std::nullopt},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.comment);
        Extraction extraction(c.body);
        EXPECT_EQ(extraction.Value("RangeDistFirstpixel"), c.first);
        EXPECT_EQ(extraction.Value("RangeDistLastpixel"), c.last);
    }
}

TEST(MetadataExtraction, band_count_is_the_number_of_space_separated_pieces) {
    struct Case {
        const char *polarizations;
        std::optional<std::string> expected;
    };
    const Case cases[] = {
        {"HH HV VH VV", "4"}, {"HH", "1"},
        {"HH  HV", "3"}, // a doubled space holds an empty piece
        {"HH HV ", "3"},      {"", std::nullopt},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.polarizations);
        Extraction extraction(std::string("<polarizations>") + c.polarizations +
                              "</polarizations>");
        EXPECT_EQ(extraction.Value("NumberOfBands"), c.expected);
    }
}

TEST(MetadataExtraction, product_format_names_the_projection) {
    struct Case {
        const char *format;
        std::optional<std::string> projection;
    };
    const Case cases[] = {
        {"GeoTIFF", "Geocoded"},
        {"geotiff", "Geocoded"},
        {"NITF", "Other"},
        {"", std::nullopt},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.format);
        Extraction extraction(std::string("<productFormat>") + c.format +
                              "</productFormat>");
        EXPECT_EQ(extraction.Value("ProjectionId"), c.projection);
        EXPECT_EQ(extraction.Value("FormatName"),
                  c.projection ? std::optional<std::string>(c.format)
                               : std::nullopt);
    }
}

TEST(MetadataExtraction, empty_grid_gives_an_empty_entry_and_no_tie_points) {
    Extraction extraction("<productId>no grid</productId>");
    EXPECT_EQ(extraction.Value("GeolocationGrid"), "");
    EXPECT_EQ(extraction.Value("SatPositions"), "");
    EXPECT_EQ(extraction.Value("SatAttitudes"), "");
    EXPECT_EQ(extraction.Model().GetTiePointCount(), 0);
}

TEST(MetadataExtraction, grid_lists_latitude_longitude_height_line_pixel) {
    // Two image coordinates but one geodetic coordinate; the second point
    // also lacks its pixel: what is missing stays zero.
    Extraction extraction(
        "<imageTiePoint><imageCoordinate><line>1.5</line><pixel>2.5</pixel>"
        "</imageCoordinate><geodeticCoordinate><latitude>10</latitude>"
        "<longitude>20</longitude><height>30</height></geodeticCoordinate>"
        "</imageTiePoint><imageTiePoint><imageCoordinate><line>7</line>"
        "</imageCoordinate></imageTiePoint>");
    EXPECT_EQ(extraction.Value("GeolocationGrid"),
              "10.000000;20.000000;30.000000;1.500000;2.500000;"
              "0.000000;0.000000;0.000000;7.000000;0.000000;");
    EXPECT_EQ(extraction.Model().GetTiePointCount(), 2);
}

TEST(MetadataExtraction, state_vectors_keep_seven_texts_each) {
    std::string vectors;
    for (int v = 1; v <= 2; ++v) {
        vectors += MkName("<stateVector><timeStamp>2010-05-08T12:00:0%d.000000Z"
                          "</timeStamp>",
                          v);
        for (int k = 0; k < 2; ++k)
            for (int a = 0; a < 3; ++a) {
                const char *tag =
                    MkName("%c%s", "xyz"[a], k == 0 ? "Position" : "Velocity");
                vectors += MkName("<%s units=\"m\">%d%d%d.5e+03</%s>", tag, v,
                                  k, a, tag);
            }
        vectors += "<unrelated>9</unrelated></stateVector>";
    }
    EXPECT_EQ(Extraction(vectors).Value("SatPositions"),
              "2010-05-08T12:00:01.000000Z;100.5e+03;101.5e+03;102.5e+03;"
              "110.5e+03;111.5e+03;112.5e+03;"
              "2010-05-08T12:00:02.000000Z;200.5e+03;201.5e+03;202.5e+03;"
              "210.5e+03;211.5e+03;212.5e+03;");
}

TEST(MetadataExtraction, attitude_times_become_seconds_of_day) {
    Extraction extraction(
        "<attitudeAngles><timeStamp>2010-05-08T12:00:01.500000Z</timeStamp>"
        "<yaw>-3.44</yaw><roll>-29.8</roll><pitch>0.0012</pitch>"
        "</attitudeAngles>"
        // A sample whose time stamp holds no clock is left out whole.
        "<attitudeAngles><timeStamp>2010-05-08</timeStamp><yaw>1</yaw>"
        "<roll>2</roll><pitch>3</pitch></attitudeAngles>"
        "<attitudeAngles><timeStamp>2010-05-08T00:00:00.000000Z</timeStamp>"
        "<yaw>4</yaw><roll>5</roll><pitch>6</pitch></attitudeAngles>");
    EXPECT_EQ(extraction.Value("SatAttitudes"),
              "43201.500000;-3.44;-29.8;0.0012;0.000000;4;5;6;");
}

TEST(MetadataExtraction, side_file_entries_are_appended) {
    Extraction extraction(
        "<beamModeMnemonic>F0W2</beamModeMnemonic>",
        "sourceInfo=\n  startTime = 2010-05-01T10:20:30.000000Z;\n"
        "  BeamMode = side;\n");
    EXPECT_EQ(extraction.Value("Acquisition_StartTime"),
              "2010-05-01T10:20:30.000000Z");
    EXPECT_EQ(extraction.Value("sourceInfo_BeamMode"), "side");
    EXPECT_EQ(extraction.Value("BeamMode"), "F0W2");
}

// The derived values of the real product (far edge, acquisition time, the
// whole grid and orbit) are checked through the host in RealProductTest.
TEST(MetadataExtraction, real_product_gives_its_annotation) {
    ProductReader reader;
    reader.productPath = HString(kRealProduct);
    DocumentParse parse(kRealProduct);
    ASSERT_NE(parse.Document(), nullptr);
    ZirOdi2SLC model;
    ExtractProductMetadata(reader, parse.Document(), &model);
    const std::pair<const char *, const char *> entries[] = {
        {"RowCount", "30466"},
        {"ColumnCount", "18465"},
        {"BeamMode", "F0W2"},
        {"LookDirection", "Right"},
        {"ProjectionId", "Geocoded"},
        {"NumberOfBands", "1"},
        {"SpatialResolutionX", "4.733"},
        {"EllipsoidName", "WGS 1984"},
    };
    for (const auto &[key, value] : entries)
        EXPECT_EQ(ListEntry(model.GetMetadata(), key), value) << key;
    const std::vector<std::string> attitudes =
        Fields(ListEntry(model.GetMetadata(), "SatAttitudes").value_or(";"));
    ASSERT_EQ(attitudes.size(), 5u * 4u);
    EXPECT_EQ(attitudes[0], "31373.864993");
    EXPECT_EQ(model.GetTiePointCount(), 44 * 31);
}

TEST(MetadataExtraction, generated_product_metadata_matches_its_options) {
    rs2test::TempDir dir;
    rs2gen::ProductOptions options;
    options.productType = "SGF";
    options.polarizations = {"HH", "HV"};
    options.width = 40;
    options.height = 30;
    options.tieGridColumns = 5;
    options.tieGridRows = 4;
    options.sideFile = true;
    const rs2gen::GeneratedProduct product =
        rs2gen::GenerateProduct(dir.Path(), options);

    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model(
        LoadProduct(reader, product.productXml.c_str(), ""));
    ASSERT_NE(model, nullptr);
    char *const *list = model->GetMetadata();
    EXPECT_EQ(ListEntry(list, "RowCount"), "30");
    EXPECT_EQ(ListEntry(list, "ColumnCount"), "40");
    EXPECT_EQ(ListEntry(list, "NumberOfBands"), "2");
    EXPECT_EQ(ListEntry(list, "Acquisition_Type"),
              rs2gen::AcquisitionTypeText(options));
    EXPECT_EQ(model->GetTiePointCount(), 5 * 4);
    EXPECT_EQ(Fields(ListEntry(list, "GeolocationGrid").value_or(";")).size(),
              5u * 4u * 5u);
    // The side file's start time is the time of the earliest line.
    EXPECT_EQ(ListEntry(list, "Acquisition_StartTime"),
              ListEntry(list, "TimeOfFirstLine"));
    EXPECT_EQ(ListEntry(list, "productInfo_productType"), "SGF");
    EXPECT_EQ(ListEntry(list, "imageInfo_bands"), std::nullopt);
}

} // namespace
