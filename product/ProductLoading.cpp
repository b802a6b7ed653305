#include "product/ProductLoading.hpp"

#include "product/DescriptionFacts.hpp"

#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/TextServices.hpp"
#include "model/ProductVariants.hpp"
#include "product/Bands.hpp"
#include "product/CalibrationTables.hpp"
#include "product/DocumentAccess.hpp"
#include "product/MetadataExtraction.hpp"
#include "product/ProductReader.hpp"
#include "product/RationalFunctions.hpp"
#include "product/TextHelpers.hpp"

#include <cstdint>
#include <cstdlib>
#include <memory>
#include <strings.h>

#include <xercesc/dom/DOMException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

namespace {

// Product and acquisition types are sets of codes in the class table.
constexpr uint32_t Bit(ProductType type) {
    return 1u << static_cast<uint32_t>(type);
}
constexpr uint32_t Bit(AcquisitionType type) {
    return 1u << static_cast<uint32_t>(type);
}
constexpr uint32_t kAny = ~0u;

constexpr uint32_t kComplexTypes = Bit(ProductType::SLC);
constexpr uint32_t kGroundRangeTypes =
    Bit(ProductType::SGX) | Bit(ProductType::SGF) | Bit(ProductType::SGC) |
    Bit(ProductType::SCN) | Bit(ProductType::SCW);
constexpr uint32_t kGeocodedTypes =
    Bit(ProductType::SSG) | Bit(ProductType::SPG);

constexpr uint32_t kQuadModes = Bit(AcquisitionType::StandardQuadPolarization) |
                                Bit(AcquisitionType::FineQuadPolarization);
constexpr uint32_t kDualModes = Bit(AcquisitionType::Standard) |
                                Bit(AcquisitionType::Wide) |
                                Bit(AcquisitionType::Fine);
constexpr uint32_t kDualScanSarModes = kDualModes |
                                       Bit(AcquisitionType::ScanSARNarrow) |
                                       Bit(AcquisitionType::ScanSARWide);

enum class ImageCount { One, Other, Any };

enum class Outcome { Model, NoModel, UnknownProductType };

template <class Variant> ZirOdi2CalibImage *Make() { return new Variant(); }

struct ClassRow {
    ImageCount images;
    uint32_t productTypes;
    uint32_t acquisitionTypes;
    Outcome outcome;
    ZirOdi2CalibImage *(*make)(); // for Outcome::Model
    bool calibrationPermitted;
};

// Which model class describes a product. The first row that applies wins,
// so the single-image rows take precedence over the product-type check, and
// each product family ends in a row that refuses the remaining modes.
const ClassRow kClassTable[] = {
    {ImageCount::One, kComplexTypes, kAny, Outcome::Model, Make<ZirOdi2SLC>,
     true},
    {ImageCount::One, kGroundRangeTypes, kAny, Outcome::Model, Make<RUZ2GrpcCR>,
     true},
    {ImageCount::One, kGeocodedTypes, kAny, Outcome::Model, Make<RUZ2GeocCR>,
     false},
    {ImageCount::Any, Bit(ProductType::Unknown), kAny,
     Outcome::UnknownProductType, nullptr, false},
    {ImageCount::Other, kComplexTypes, kQuadModes, Outcome::Model,
     Make<ZirOdi2SLCS4C>, true},
    {ImageCount::Other, kComplexTypes, kDualModes, Outcome::Model,
     Make<ZirOdi2SLCS2C>, true},
    {ImageCount::Other, kComplexTypes, kAny, Outcome::NoModel, nullptr, false},
    {ImageCount::Other, kGroundRangeTypes, kQuadModes, Outcome::Model,
     Make<RUZ2GrpC4R>, true},
    {ImageCount::Other, kGroundRangeTypes, kDualScanSarModes, Outcome::Model,
     Make<RUZ2GrpC2R>, true},
    {ImageCount::Other, kGroundRangeTypes, kAny, Outcome::NoModel, nullptr,
     false},
    {ImageCount::Other, kGeocodedTypes, kQuadModes, Outcome::Model,
     Make<RUZ2GeocC4R>, false},
    {ImageCount::Other, kGeocodedTypes, kDualModes, Outcome::Model,
     Make<RUZ2GeocC2R>, false},
    {ImageCount::Other, kGeocodedTypes, kAny, Outcome::NoModel, nullptr, false},
};

bool Applies(const ClassRow &row, std::size_t imageCount,
             ProductType productType, AcquisitionType acquisitionType) {
    bool images = row.images == ImageCount::Any ||
                  (row.images == ImageCount::One) == (imageCount == 1);
    return images && (row.productTypes & Bit(productType)) != 0 &&
           (row.acquisitionTypes & Bit(acquisitionType)) != 0;
}

const ClassRow *ChooseClass(std::size_t imageCount, ProductType productType,
                            AcquisitionType acquisitionType) {
    for (const ClassRow &row : kClassTable)
        if (Applies(row, imageCount, productType, acquisitionType))
            return &row;
    return nullptr;
}

std::size_t CountImageFiles(const xercesc::DOMDocument *document) {
    return CountElementsByTag(document, "fullResolutionImageData");
}

bool CalibrationRequested(const char *option) {
    return option != nullptr && *option != '\0' &&
           strcasecmp(option, "none") != 0;
}

// Has the readers of the product description fill a new model, in the order
// in which each relies on the previous ones.
void FillModel(ProductReader &reader, const xercesc::DOMDocument *document,
               ZirOdi2CalibImage &model, const ClassRow &row,
               ProductType productType, AcquisitionType acquisitionType,
               const char *path, const char *calibrationOption) {
    model.SetProductType(static_cast<int32_t>(productType));
    model.SetAcquisitionType(static_cast<int32_t>(acquisitionType));
    model.SetProductDirectory(path);
    ReadPolarizations(document, &model);
    LookupTableFiles tableFiles;
    if (row.calibrationPermitted && CalibrationRequested(calibrationOption))
        LoadCalibration(document, &model, calibrationOption, tableFiles);
    else
        model.SetCalibrationType("None");
    ReadIncidenceAngles(document, &model,
                        productType == ProductType::SLC
                            ? IncidenceFormula::Complex
                            : IncidenceFormula::Detected,
                        tableFiles);
    ReadLooks(document, &model);
    ExtractProductMetadata(reader, document, &model);
    ReadRationalFunctions(reader, document, &model);
    model.SetRationalFunctions(reader.rationalFunctions);
}

std::unique_ptr<ZirOdi2CalibImage>
LoadDescription(ProductReader &reader, const char *path, const char *option) {
    // The parse is released, and the XML platform terminated, on every way
    // out of this function, the thrown "Unknown product type" included.
    DocumentParse parse(path);
    const xercesc::DOMDocument *document = parse.Document();
    // A file in which the parser found no element at all (an empty file,
    // text or binary data) is no product description: not recognised,
    // rather than a description of an unknown product type. Image files the
    // host cannot read itself are offered here too.
    if (document == nullptr || document->getDocumentElement() == nullptr)
        return nullptr;
    ProductType productType = ParseProductType(document);
    AcquisitionType acquisitionType = ParseAcquisitionType(document);
    const ClassRow *row =
        ChooseClass(CountImageFiles(document), productType, acquisitionType);
    if (row == nullptr || row->outcome == Outcome::NoModel)
        return nullptr;
    if (row->outcome == Outcome::UnknownProductType)
        throw orv::Exception(_("Unknown product type"), "", "", 0);
    std::unique_ptr<ZirOdi2CalibImage> model(row->make());
    FillModel(reader, document, *model, *row, productType, acquisitionType,
              path, option);
    RememberDescriptionFacts(path, FactsOfDescription(document));
    return model;
}

ProductType ProductTypeFromName(const char *name) {
    static const CodeName<ProductType> kNames[] = {
        {"SLC", ProductType::SLC}, {"SGX", ProductType::SGX},
        {"SGF", ProductType::SGF}, {"SGC", ProductType::SGC},
        {"SCN", ProductType::SCN}, {"SCW", ProductType::SCW},
        {"SSG", ProductType::SSG}, {"SPG", ProductType::SPG},
    };
    return CodeFromName(name, kNames, ProductType::Unknown);
}

} // namespace

ZirOdi2CalibImage *LoadProduct(ProductReader &reader, const char *path,
                               const char *calibrationOption) {
    if (path == nullptr)
        return nullptr;
    char *copy = HString(path);
    std::free(reader.productPath);
    reader.productPath = copy;
    // Only the host's reports and its exception reach the host; a failure
    // of the parser or of the standard library means the product cannot be
    // loaded.
    try {
        return LoadDescription(reader, path, calibrationOption).release();
    } catch (const orv::Exception &) {
        throw;
    } catch (const host::ReportedError &) {
        throw;
    } catch (const xercesc::XMLException &) {
    } catch (const xercesc::DOMException &) {
    } catch (const xercesc::OutOfMemoryException &) {
    } catch (const std::exception &) {
    }
    return nullptr;
}

ProductType ParseProductType(const xercesc::DOMDocument *document) {
    if (document == nullptr)
        return ProductType::Unknown;
    HostString text(ElementText(document, "productType"));
    return ProductTypeFromName(text.get());
}

AcquisitionType ParseAcquisitionType(const xercesc::DOMDocument *document) {
    if (document == nullptr)
        return AcquisitionType::Unknown;
    HostString text(ElementText(document, "acquisitionType"));
    return AcquisitionTypeFromName(text.get());
}

AcquisitionType AcquisitionTypeFromName(const char *name) {
    static const CodeName<AcquisitionType> kNames[] = {
        {"Standard", AcquisitionType::Standard},
        {"Wide", AcquisitionType::Wide},
        {"Fine", AcquisitionType::Fine},
        {"Multi-Look Fine", AcquisitionType::MultiLookFine},
        {"Ultrafine", AcquisitionType::Ultrafine},
        {"Low Incidence", AcquisitionType::LowIncidence},
        {"High Incidence", AcquisitionType::HighIncidence},
        {"Standard Quad Polarization",
         AcquisitionType::StandardQuadPolarization},
        {"Fine Quad Polarization", AcquisitionType::FineQuadPolarization},
        {"ScanSAR Narrow", AcquisitionType::ScanSARNarrow},
        {"ScanSAR Wide", AcquisitionType::ScanSARWide},
    };
    return CodeFromName(name, kNames, AcquisitionType::Unknown);
}

void ReadLooks(const xercesc::DOMDocument *document, ZirOdi2CalibImage *model) {
    if (document == nullptr || model == nullptr)
        return;
    HostString range(ElementText(document, "numberOfRangeLooks"));
    HostString azimuth(ElementText(document, "numberOfAzimuthLooks"));
    model->SetRangeLooks(range.get());
    model->SetAzimuthLooks(azimuth.get());
}
