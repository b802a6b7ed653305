#include "tools/generator/ProductXmlWriter.hpp"

#include "tools/generator/Calibration.hpp"
#include "tools/generator/RationalFunctions.hpp"
#include "tools/generator/SceneGeometry.hpp"
#include "tools/generator/TextFile.hpp"
#include "tools/generator/XmlWriter.hpp"

#include <cstdio>

namespace rs2gen {

namespace {

constexpr double speedOfLight = 299792458.0;                 // m/s
constexpr double radarCenterFrequency = 5.405000454334350e9; // Hz

// The product files write most numbers with 16 significant digits and the
// single-precision ones (spacings, angles, grid positions) with 9.
std::string Double(double value) { return ScientificText(value, 15); }
std::string Single(double value) { return ScientificText(value, 8); }

XmlWriter::Attributes Units(const char *units) { return {{"units", units}}; }

template <typename Numbers> std::string DoublesText(const Numbers &numbers) {
    std::vector<std::string> texts;
    for (double number : numbers)
        texts.push_back(Double(number));
    return JoinedBySpaces(texts);
}

std::string ProductId(const ProductOptions &options) {
    char text[16];
    std::snprintf(text, sizeof text, "PDS_%08u",
                  static_cast<unsigned>(options.seed % 100000000u));
    return text;
}

std::string TimeOrdering(bool decreasing) {
    return decreasing ? "Decreasing" : "Increasing";
}

void WriteNoiseLevels(XmlWriter &xml, const ProductOptions &options) {
    for (const CalibrationKind &kind : calibrationKinds) {
        const NoiseProfile noise = ReferenceNoiseLevels(options, kind.name);
        std::vector<std::string> levels;
        for (double level : noise.levels)
            levels.push_back(Single(level));
        xml.Open("referenceNoiseLevel",
                 {{"incidenceAngleCorrection", kind.name}});
        xml.Element("pixelFirstNoiseValue", std::to_string(noise.firstPixel));
        xml.Element("stepSize", std::to_string(noise.stepSize));
        xml.Element("numberOfNoiseLevelValues",
                    std::to_string(noise.levels.size()));
        xml.Element("noiseLevelValues", JoinedBySpaces(levels), Units("dB"));
        xml.Close();
    }
}

void WriteRadarParameters(XmlWriter &xml, const ProductOptions &options,
                          const SceneGeometry &geometry) {
    const std::string beam = geometry.Beam().mnemonic;
    xml.Open("radarParameters");
    xml.Element("acquisitionType", AcquisitionTypeText(options));
    xml.Element("beams", beam);
    xml.Element("polarizations", JoinedBySpaces(options.polarizations));
    xml.Element("radarCenterFrequency", Double(radarCenterFrequency),
                Units("Hz"));
    xml.Element("pulseRepetitionFrequency",
                Double(geometry.Beam().pulseRepetitionFrequency),
                {{"beam", beam}, {"units", "Hz"}});
    xml.Element("antennaPointing", "Right");
    xml.Element("yawSteeringFlag", "YawSteeringOn");
    WriteNoiseLevels(xml, options);
    xml.Close();
}

void WriteOrbitAndAttitude(XmlWriter &xml, const SceneGeometry &geometry) {
    xml.Open("orbitAndAttitude");
    xml.Open("orbitInformation");
    xml.Element("passDirection", "Ascending");
    xml.Element("orbitDataSource", "Definitive");
    for (const StateVector &vector : geometry.StateVectors()) {
        xml.Open("stateVector");
        xml.Element("timeStamp", DateTimeText(vector.secondsOfDay));
        const char *const positions[] = {"xPosition", "yPosition", "zPosition"};
        const char *const velocities[] = {"xVelocity", "yVelocity",
                                          "zVelocity"};
        for (size_t axis = 0; axis < 3; ++axis)
            xml.Element(positions[axis], Double(vector.position[axis]),
                        Units("m"));
        for (size_t axis = 0; axis < 3; ++axis)
            xml.Element(velocities[axis], Double(vector.velocity[axis]),
                        Units("m/s"));
        xml.Close();
    }
    xml.Close();
    xml.Open("attitudeInformation");
    xml.Element("attitudeDataSource", "Downlink");
    for (const AttitudeSample &sample : geometry.Attitudes()) {
        xml.Open("attitudeAngles");
        xml.Element("timeStamp", DateTimeText(sample.secondsOfDay));
        xml.Element("yaw", Double(sample.yaw), Units("deg"));
        xml.Element("roll", Double(sample.roll), Units("deg"));
        xml.Element("pitch", Double(sample.pitch), Units("deg"));
        xml.Close();
    }
    xml.Close();
    xml.Close();
}

void WriteSourceAttributes(XmlWriter &xml, const ProductOptions &options,
                           const SceneGeometry &geometry) {
    xml.Open("sourceAttributes");
    xml.Element("satellite", "RADARSAT-2");
    xml.Element("sensor", "SAR");
    xml.Element("beamModeMnemonic", geometry.Beam().mnemonic);
    xml.Element("rawDataStartTime", DateTimeText(geometry.RawDataStartTime()));
    WriteRadarParameters(xml, options, geometry);
    WriteOrbitAndAttitude(xml, geometry);
    xml.Close();
}

void WriteWindow(XmlWriter &xml, const char *name) {
    xml.Open(name);
    xml.Element("windowName", "Kaiser");
    xml.Element("windowCoefficient", Single(2.4));
    xml.Close();
}

void WriteSarProcessing(XmlWriter &xml, const ProductOptions &options,
                        const SceneGeometry &geometry) {
    const ProductLayout &layout = geometry.Layout();
    xml.Open("sarProcessingInformation");
    xml.Element("lutApplied", "Point Target");
    xml.Element("zeroDopplerTimeFirstLine", DateTimeText(geometry.LineTime(0)));
    xml.Element("zeroDopplerTimeLastLine",
                DateTimeText(geometry.LineTime(options.height - 1)));
    xml.Element("numberOfLinesProcessed",
                std::to_string(options.height * layout.azimuthLooks));
    xml.Element("numberOfRangeLooks", std::to_string(layout.rangeLooks));
    xml.Element("numberOfAzimuthLooks", std::to_string(layout.azimuthLooks));
    WriteWindow(xml, "azimuthWindow");
    WriteWindow(xml, "rangeWindow");
    xml.Element("incidenceAngleNearRange",
                Single(geometry.IncidenceDegrees(geometry.NearRangeColumn())),
                Units("deg"));
    xml.Element("incidenceAngleFarRange",
                Single(geometry.IncidenceDegrees(geometry.FarRangeColumn())),
                Units("deg"));
    xml.Element("slantRangeNearEdge", Double(geometry.SlantRangeNearEdge()),
                Units("m"));
    xml.Element("satelliteHeight", Double(SceneGeometry::satelliteHeight),
                Units("m"));
    xml.Close();
}

void WriteImageGenerationParameters(XmlWriter &xml,
                                    const ProductOptions &options,
                                    const SceneGeometry &geometry) {
    const std::string midTime = DateTimeText(
        0.5 * (geometry.EarliestLineTime() + geometry.LatestLineTime()));
    const double nearRangeTime =
        2.0 * geometry.SlantRangeNearEdge() / speedOfLight;
    xml.Open("imageGenerationParameters");
    xml.Open("generalProcessingInformation");
    xml.Element("productType", options.productType);
    xml.Element("processingFacility", "SYN");
    xml.Element("softwareVersion", "rs2 sample");
    xml.Close();
    WriteSarProcessing(xml, options, geometry);
    xml.Open("dopplerCentroid");
    xml.Element("timeOfDopplerCentroidEstimate", midTime);
    xml.Element("dopplerAmbiguity", "0");
    xml.Element("dopplerCentroidReferenceTime", Double(nearRangeTime),
                Units("s"));
    xml.Element("dopplerCentroidCoefficients",
                DoublesText(std::vector<double>{-1.32e2, 4.71e4, -9.86e6}));
    xml.Element("dopplerCentroidConfidence", Double(0.97));
    xml.Close();
    xml.Open("slantRangeToGroundRange");
    xml.Element("zeroDopplerAzimuthTime", midTime);
    xml.Element("slantRangeTimeToFirstRangeSample", Double(nearRangeTime),
                Units("s"));
    xml.Element("groundRangeOrigin", Double(0.0), Units("m"));
    xml.Element("groundToSlantRangeCoefficients",
                DoublesText(geometry.GroundToSlantRangeCoefficients()));
    xml.Close();
    xml.Close();
}

void WriteRasterAttributes(XmlWriter &xml, const ProductOptions &options,
                           const SceneGeometry &geometry) {
    const bool complex = IsComplexProduct(options);
    xml.Open("rasterAttributes");
    xml.Element("dataType", complex ? "Complex" : "Magnitude Detected");
    if (complex) {
        xml.Element("bitsPerSample", "16", {{"dataStream", "Real"}});
        xml.Element("bitsPerSample", "16", {{"dataStream", "Imaginary"}});
    } else {
        xml.Element("bitsPerSample", "16", {{"dataStream", "Magnitude"}});
    }
    xml.Element("numberOfSamplesPerLine", std::to_string(options.width));
    xml.Element("numberOfLines", std::to_string(options.height));
    xml.Element("sampledPixelSpacing", Single(geometry.Layout().pixelSpacing),
                Units("m"));
    xml.Element("sampledLineSpacing", Single(geometry.Layout().lineSpacing),
                Units("m"));
    xml.Element("lineTimeOrdering", TimeOrdering(options.lineTimeDecreasing));
    xml.Element("pixelTimeOrdering", TimeOrdering(options.pixelTimeDecreasing));
    xml.Close();
}

void WriteGeolocationGrid(XmlWriter &xml, const ProductOptions &options,
                          const SceneGeometry &geometry) {
    xml.Open("geolocationGrid");
    for (const TiePoint &point :
         geometry.TieGrid(options.tieGridColumns, options.tieGridRows)) {
        xml.Open("imageTiePoint");
        xml.Open("imageCoordinate");
        xml.Element("line", Single(point.line));
        xml.Element("pixel", Single(point.pixel));
        xml.Close();
        xml.Open("geodeticCoordinate");
        xml.Element("latitude", Double(point.ground.latitude), Units("deg"));
        xml.Element("longitude", Double(point.ground.longitude), Units("deg"));
        xml.Element("height", Double(point.ground.height), Units("m"));
        xml.Close();
        xml.Close();
    }
    xml.Close();
}

void WriteRationalFunctions(XmlWriter &xml, const SceneGeometry &geometry) {
    const RationalFunctionModel model = RationalFunctionsOf(geometry);
    xml.Open("rationalFunctions");
    xml.Element("biasError", Double(0.5), Units("m"));
    xml.Element("randomError", Double(0.5), Units("m"));
    xml.Element("lineOffset", Double(model.lineOffset));
    xml.Element("pixelOffset", Double(model.pixelOffset));
    xml.Element("latitudeOffset", Double(model.latitudeOffset), Units("deg"));
    xml.Element("longitudeOffset", Double(model.longitudeOffset), Units("deg"));
    xml.Element("heightOffset", Double(model.heightOffset), Units("m"));
    xml.Element("lineScale", Double(model.lineScale));
    xml.Element("pixelScale", Double(model.pixelScale));
    xml.Element("latitudeScale", Double(model.latitudeScale));
    xml.Element("longitudeScale", Double(model.longitudeScale));
    xml.Element("heightScale", Double(model.heightScale));
    xml.Element("lineNumeratorCoefficients", DoublesText(model.lineNumerator));
    xml.Element("lineDenominatorCoefficients",
                DoublesText(model.lineDenominator));
    xml.Element("pixelNumeratorCoefficients",
                DoublesText(model.pixelNumerator));
    xml.Element("pixelDenominatorCoefficients",
                DoublesText(model.pixelDenominator));
    xml.Close();
}

void WriteEllipsoid(XmlWriter &xml) {
    xml.Open("referenceEllipsoidParameters");
    xml.Element("ellipsoidName", "WGS 1984");
    xml.Element("semiMajorAxis", Double(SceneGeometry::semiMajorAxis),
                Units("m"));
    xml.Element("semiMinorAxis", Double(SceneGeometry::semiMinorAxis),
                Units("m"));
    xml.Element("datumShiftParameters", DoublesText(std::vector<double>(3)),
                Units("m"));
    xml.Element("geodeticTerrainHeight", Double(SceneGeometry::terrainHeight),
                Units("m"));
    xml.Close();
}

void WriteImageAttributes(XmlWriter &xml, const ProductOptions &options,
                          const SceneGeometry &geometry) {
    xml.Open("imageAttributes");
    xml.Element("productFormat", "GeoTIFF");
    xml.Element("outputMediaInterleaving", "BSQ");
    WriteRasterAttributes(xml, options, geometry);
    xml.Open("geographicInformation");
    if (options.tiePoints && options.geolocationGrid)
        WriteGeolocationGrid(xml, options, geometry);
    if (options.rationalFunctions)
        WriteRationalFunctions(xml, geometry);
    WriteEllipsoid(xml);
    xml.Close();
    for (const CalibrationKind &kind : calibrationKinds)
        xml.Element("lookupTable", kind.fileName,
                    {{"incidenceAngleCorrection", kind.name}});
    for (const std::string &polarization : options.polarizations)
        xml.Element("fullResolutionImageData", ImageFileName(polarization),
                    {{"pole", polarization}});
    xml.Close();
}

} // namespace

void WriteProductXml(const std::string &path, const ProductOptions &options) {
    const SceneGeometry geometry(options);
    WriteTextFile(path, [&](std::ostream &out) {
        XmlWriter xml(out);
        xml.Open(
            "product",
            {{"xmlns", "http://www.rsi.ca/rs2/prod/xml/schemas"},
             {"xmlns:xsi", "http://www.w3.org/2001/XMLSchema-instance"},
             {"xsi:schemaLocation", "http://www.rsi.ca/rs2/prod/xml/schemas "
                                    "schemas/rs2prod_product.xsd"}});
        xml.Element("productId", ProductId(options));
        WriteSourceAttributes(xml, options, geometry);
        WriteImageGenerationParameters(xml, options, geometry);
        WriteImageAttributes(xml, options, geometry);
        xml.Close();
    });
}

} // namespace rs2gen
