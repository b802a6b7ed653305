#include "product/MetadataExtraction.hpp"

#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "model/ProductVariants.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace {

const char *const kRealProduct =
    RS2_SOURCE_DIR "/../shared/realdata/rs2_slc_f0w2_hh_20170430/product.xml";

void WriteText(const std::string &path, const std::string &text) {
    std::ofstream out(path);
    out << text;
}

std::optional<std::string> Entry(char *const *list, const char *key) {
    const char *value = FetchAuxEntry(list, key);
    if (value == nullptr)
        return std::nullopt;
    return std::string(value);
}

std::vector<std::string> Fields(const std::string &text) {
    std::vector<std::string> fields = SplitTokens(text, ";");
    // Every field is followed by ';', so the split leaves one empty tail.
    EXPECT_FALSE(fields.empty());
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
        std::string path = dir.File("product.xml");
        WriteText(path, "<?xml version=\"1.0\"?>\n<product>" + productBody +
                            "</product>\n");
        if (!sideFile.empty())
            WriteText(dir.File("ProductDescription.self"), sideFile);
        reader.productPath = HString(path.c_str());
        DocumentParse parse(path.c_str());
        EXPECT_NE(parse.Document(), nullptr);
        ExtractProductMetadata(reader, parse.Document(), &model);
    }

    std::optional<std::string> Value(const char *key) const {
        return Entry(model.GetMetadata(), key);
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

TEST(MetadataExtraction,
     look_direction_is_set_always_and_antenna_pointing_never) {
    Extraction right("<antennaPointing>Right</antennaPointing>");
    EXPECT_EQ(right.Value("LookDirection"), "Right");
    EXPECT_EQ(right.Value("antennaPointing"), std::nullopt);

    // No antennaPointing element at all.
    Extraction missing("<productId>P1</productId>");
    EXPECT_EQ(missing.Value("LookDirection"), "");
    EXPECT_EQ(missing.Value("antennaPointing"), std::nullopt);
}

TEST(MetadataExtraction, source_entries_are_copied_when_present) {
    Extraction extraction("<productId>PDS_1</productId>"
                          "<beamModeMnemonic>F0W2</beamModeMnemonic>"
                          "<acquisitionType>Fine</acquisitionType>"
                          "<passDirection>Ascending</passDirection>"
                          "<pulseRepetitionFrequency>1328.8"
                          "</pulseRepetitionFrequency>"
                          "<satelliteHeight>802440</satelliteHeight>");
    EXPECT_EQ(extraction.Value("PlatformName"), "RADARSAT-2");
    EXPECT_EQ(extraction.Value("productId"), "PDS_1");
    EXPECT_EQ(extraction.Value("SourceID"), "PDS_1");
    EXPECT_EQ(extraction.Value("BeamMode"), "F0W2");
    EXPECT_EQ(extraction.Value("Acquisition_Type"), "Fine");
    EXPECT_EQ(extraction.Value("OrbitDirection"), "Ascending");
    EXPECT_EQ(extraction.Value("passDirection"), "Ascending");
    EXPECT_EQ(extraction.Value("PulseRepetitionFrequency"), "1328.8");
    EXPECT_EQ(extraction.Value("SatelliteAltitude"), "802440");

    // An empty element counts as missing.
    Extraction empty("<beamModeMnemonic></beamModeMnemonic>");
    EXPECT_EQ(empty.Value("BeamMode"), std::nullopt);
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
    char *const *list = extraction.Model().GetMetadata();
    EXPECT_EQ(Entry(list, "azimuthWindow"), std::nullopt);
    EXPECT_EQ(Entry(list, "rangeWindow"), std::nullopt);
    EXPECT_EQ(Entry(list, "windowName"), std::nullopt);
    EXPECT_EQ(Entry(list, "numberOfRangeLooks"), std::nullopt);
    EXPECT_EQ(Entry(list, "NUMBEROFAZIMUTHLOOKS"), std::nullopt);
    EXPECT_EQ(Entry(list, "numberOfLinesProcessed"), std::nullopt);
    EXPECT_EQ(Entry(list, "lutApplied"), "Point Target");
    // A comment is a child node too and keeps the parser's name for it.
    EXPECT_EQ(Entry(list, "#comment"), "kept");
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
    "<rasterAttributes><numberOfSamplesPerLine>101</numberOfSamplesPerLine>"
    "<sampledPixelSpacing>2.5</sampledPixelSpacing>"
    "<pixelTimeOrdering>%s</pixelTimeOrdering></rasterAttributes>"
    "<sarProcessingInformation><slantRangeNearEdge>800000"
    "</slantRangeNearEdge></sarProcessingInformation>"
    "<slantRangeToGroundRange><groundRangeOrigin>%s</groundRangeOrigin>"
    "%s</slantRangeToGroundRange>";

std::string RangeGeometry(const std::string &type, const char *pixelOrder,
                          const char *origin, const char *coefficients) {
    return ProductTypeElement(type) +
           MkName(kRangeGeometry, pixelOrder, origin, coefficients);
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
        {"ground range product: the polynomial at the line's end",
         RangeGeometry("SGF", "Increasing", "50",
                       "<groundToSlantRangeCoefficients>1000 2 0.5 0 0 0"
                       "</groundToSlantRangeCoefficients>"),
         // g = 100 * 2.5 - 50 = 200: 1000 + 2 * 200 + 0.5 * 200^2
         "21400.0000"},
        {"every coefficient counts",
         RangeGeometry("SGX", "Increasing", "0",
                       "<groundToSlantRangeCoefficients>0 0 0 0 0 2e-10"
                       "</groundToSlantRangeCoefficients>"),
         // 250^5 * 2e-10
         "195.3125"},
        {"ground range product without a polynomial",
         RangeGeometry("SGF", "Increasing", "0", ""), std::nullopt},
        {"five coefficients: the sixth is 0",
         RangeGeometry("SGF", "Increasing", "0",
                       "<groundToSlantRangeCoefficients>0 0 0 0 1e-8"
                       "</groundToSlantRangeCoefficients>"),
         // 250^4 * 1e-8
         "39.0625"},
        {"three coefficients: a quadratic",
         RangeGeometry("SGF", "Increasing", "50",
                       "<groundToSlantRangeCoefficients>1000 2 0.5"
                       "</groundToSlantRangeCoefficients>"),
         "21400.0000"},
        {"numbers up to the first text that is none",
         RangeGeometry("SGF", "Increasing", "50",
                       "<groundToSlantRangeCoefficients>1000 2 x 7"
                       "</groundToSlantRangeCoefficients>"),
         // 1000 + 2 * 200
         "1400.0000"},
        {"no number at all",
         RangeGeometry("SGF", "Increasing", "0",
                       "<groundToSlantRangeCoefficients>none"
                       "</groundToSlantRangeCoefficients>"),
         std::nullopt},
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
        Extraction extraction(c.body);
        EXPECT_EQ(extraction.Value("SlantRangeFarEdge"), c.farEdge);
    }
}

TEST(MetadataExtraction, single_column_slc_has_its_far_edge_at_the_near_edge) {
    Extraction extraction(
        ProductTypeElement("SLC") +
        "<rasterAttributes><numberOfSamplesPerLine>1</numberOfSamplesPerLine>"
        "<sampledPixelSpacing>4.7</sampledPixelSpacing></rasterAttributes>"
        "<sarProcessingInformation><slantRangeNearEdge>9.157287974741652e+05"
        "</slantRangeNearEdge></sarProcessingInformation>"
        "<slantRangeToGroundRange><groundRangeOrigin>0</groundRangeOrigin>"
        "</slantRangeToGroundRange>");
    EXPECT_EQ(extraction.Value("SlantRangeNearEdge"), "915728.7975");
    EXPECT_EQ(extraction.Value("SlantRangeFarEdge"), "915728.7975");
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
    Extraction extraction(
        "<imageTiePoint><imageCoordinate><line>0</line><pixel>0</pixel>"
        "</imageCoordinate><geodeticCoordinate><latitude>45.5</latitude>"
        "<longitude>-73.25</longitude><height>0</height>"
        "</geodeticCoordinate></imageTiePoint>");
    EXPECT_EQ(extraction.Value("GeolocationGrid"),
              "45.500000;-73.250000;0.000000;0.000000;0.000000;");
    EXPECT_EQ(extraction.Model().GetTiePointCount(), 1);
}

TEST(MetadataExtraction, grid_points_without_ground_coordinates_stay_zero) {
    // Two image coordinates but one geodetic coordinate; the second point
    // also lacks its pixel.
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
    for (int v = 0; v < 2; ++v) {
        vectors += "<stateVector>";
        vectors +=
            MkName("<timeStamp>2010-05-08T12:00:0%d.000000Z</timeStamp>", v);
        for (const char *axis : {"x", "y", "z"})
            vectors += MkName("<%sPosition units=\"m\">%d.5e+06</%sPosition>",
                              axis, v + 1, axis);
        for (const char *axis : {"x", "y", "z"})
            vectors += MkName("<%sVelocity>-%d.25e+03</%sVelocity>", axis,
                              v + 1, axis);
        vectors += "<unrelated>9</unrelated></stateVector>";
    }
    Extraction extraction(vectors);
    std::optional<std::string> positions = extraction.Value("SatPositions");
    ASSERT_TRUE(positions);
    std::vector<std::string> fields = Fields(*positions);
    const std::vector<std::string> expected = {"2010-05-08T12:00:00.000000Z",
                                               "1.5e+06",
                                               "1.5e+06",
                                               "1.5e+06",
                                               "-1.25e+03",
                                               "-1.25e+03",
                                               "-1.25e+03",
                                               "2010-05-08T12:00:01.000000Z",
                                               "2.5e+06",
                                               "2.5e+06",
                                               "2.5e+06",
                                               "-2.25e+03",
                                               "-2.25e+03",
                                               "-2.25e+03"};
    EXPECT_EQ(fields, expected);
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

TEST(MetadataExtraction, real_product_gives_its_annotation) {
    ProductReader reader;
    reader.productPath = HString(kRealProduct);
    DocumentParse parse(kRealProduct);
    ASSERT_NE(parse.Document(), nullptr);
    ZirOdi2SLC model;
    ExtractProductMetadata(reader, parse.Document(), &model);
    char *const *list = model.GetMetadata();

    EXPECT_EQ(Entry(list, "RowCount"), "30466");
    EXPECT_EQ(Entry(list, "ColumnCount"), "18465");
    EXPECT_EQ(Entry(list, "BeamMode"), "F0W2");
    EXPECT_EQ(Entry(list, "LookDirection"), "Right");
    EXPECT_EQ(Entry(list, "ProjectionId"), "Geocoded");
    EXPECT_EQ(Entry(list, "NumberOfBands"), "1");
    EXPECT_EQ(Entry(list, "SpatialResolutionX"), "4.733");
    EXPECT_EQ(Entry(list, "EllipsoidName"), "WGS 1984");
    EXPECT_EQ(Entry(list, "SlantRangeNearEdge"), "915728.7975");
    // SLC: (18465 - 1) * 4.733 + 915728.7975; pixels run near to far.
    std::optional<std::string> farEdge = Entry(list, "SlantRangeFarEdge");
    ASSERT_TRUE(farEdge);
    EXPECT_NEAR(std::atof(farEdge->c_str()), 1003118.9095, 1e-4);
    EXPECT_EQ(Entry(list, "RangeDistFirstpixel"), "915728.7975");
    EXPECT_EQ(Entry(list, "RangeDistLastpixel"), farEdge);
    // Middle of 08:43:16.790276 and 08:42:53.864993.
    std::optional<std::string> acquired = Entry(list, "Acquisition_DateTime");
    ASSERT_TRUE(acquired);
    EXPECT_EQ(acquired->substr(0, 25), "2017-04-30T08:43:05.32763");

    std::optional<std::string> positions = Entry(list, "SatPositions");
    ASSERT_TRUE(positions);
    std::vector<std::string> fields = Fields(*positions);
    ASSERT_EQ(fields.size(), 5u * 7u);
    EXPECT_EQ(fields[0], "2017-04-30T08:42:53.864993Z");
    EXPECT_EQ(fields[34], "6.563661941755638e+03");

    std::optional<std::string> attitudes = Entry(list, "SatAttitudes");
    ASSERT_TRUE(attitudes);
    std::vector<std::string> samples = Fields(*attitudes);
    ASSERT_EQ(samples.size(), 5u * 4u);
    EXPECT_EQ(samples[0], "31373.864993");

    std::optional<std::string> grid = Entry(list, "GeolocationGrid");
    ASSERT_TRUE(grid);
    std::vector<std::string> gridFields = Fields(*grid);
    ASSERT_EQ(gridFields.size(), 44u * 31u * 5u);
    // The last tie point sits at the last pixel of the last line.
    EXPECT_EQ(gridFields[gridFields.size() - 2], "30465.000000");
    EXPECT_EQ(gridFields.back(), "18464.000000");
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
    rs2gen::GeneratedProduct product =
        rs2gen::GenerateProduct(dir.Path(), options);

    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model(
        LoadProduct(reader, product.productXml.c_str(), ""));
    ASSERT_NE(model, nullptr);
    char *const *list = model->GetMetadata();
    EXPECT_EQ(Entry(list, "RowCount"), "30");
    EXPECT_EQ(Entry(list, "ColumnCount"), "40");
    EXPECT_EQ(Entry(list, "NumberOfBands"), "2");
    EXPECT_EQ(Entry(list, "Acquisition_Type"),
              rs2gen::AcquisitionTypeText(options));
    EXPECT_EQ(model->GetTiePointCount(), 5 * 4);
    std::optional<std::string> grid = Entry(list, "GeolocationGrid");
    ASSERT_TRUE(grid);
    EXPECT_EQ(Fields(*grid).size(), 5u * 4u * 5u);
    std::optional<std::string> positions = Entry(list, "SatPositions");
    ASSERT_TRUE(positions);
    EXPECT_EQ(Fields(*positions).size() % 7, 0u);
    EXPECT_GT(Fields(*positions).size(), 0u);
    // A ground range product has its far edge from the polynomial.
    EXPECT_TRUE(Entry(list, "SlantRangeFarEdge"));
    EXPECT_TRUE(Entry(list, "Acquisition_DateTime"));
    // The side file's start time is the time of the earliest line.
    EXPECT_EQ(Entry(list, "Acquisition_StartTime"),
              Entry(list, "TimeOfFirstLine"));
    EXPECT_EQ(Entry(list, "productInfo_productType"), "SGF");
    EXPECT_EQ(Entry(list, "imageInfo_bands"), std::nullopt);
}

} // namespace
