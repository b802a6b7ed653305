#include "tools/generator/ProductGenerator.hpp"

#include "tools/generator/Calibration.hpp"
#include "tools/generator/ImageWriter.hpp"
#include "tools/generator/ProductXmlWriter.hpp"
#include "tools/generator/SideFileWriter.hpp"

#include <cmath>
#include <filesystem>
#include <stdexcept>
#include <system_error>

namespace rs2gen {

namespace {

// A GeoTIFF tie point tag holds at most 65535 numbers, six per point.
constexpr int maximumTieGridSide = 100;

void RequireRange(const char *name, int value, int low, int high) {
    if (value < low || value > high)
        throw std::runtime_error(
            std::string(name) + " must lie in [" + std::to_string(low) + ", " +
            std::to_string(high) + "], not " + std::to_string(value));
}

void Validate(const std::string &directory, const ProductOptions &options) {
    if (directory.empty())
        throw std::runtime_error("no product folder given");
    RequireRange("width", options.width, 1, 1 << 30);
    RequireRange("height", options.height, 1, 1 << 30);
    RequireRange("tie grid columns", options.tieGridColumns, 1,
                 maximumTieGridSide);
    RequireRange("tie grid rows", options.tieGridRows, 1, maximumTieGridSide);
    // The footprint is a local flat-earth model, which degrades near the
    // poles.
    if (!(std::fabs(options.centerLatitude) <= 85.0) ||
        !(std::fabs(options.centerLongitude) <= 180.0))
        throw std::runtime_error(
            "scene centre must lie within 85 degrees of the equator and 180 "
            "degrees of the prime meridian");
    for (const std::string &polarization : options.polarizations)
        if (polarization.find_first_of(std::string("/\0", 2)) !=
            std::string::npos)
            throw std::runtime_error("polarization name '" + polarization +
                                     "' cannot be part of a file name");
}

std::string PathIn(const std::string &directory, const std::string &name) {
    return (std::filesystem::path(directory) / name).string();
}

void CreateFolder(const std::string &directory) {
    std::error_code error;
    std::filesystem::create_directories(directory, error);
    if (error)
        throw std::runtime_error("cannot create the product folder " +
                                 directory + ": " + error.message());
}

} // namespace

std::string ImageFileName(const std::string &polarization) {
    return "imagery_" + polarization + ".tif";
}

GeneratedProduct GenerateProduct(const std::string &directory,
                                 const ProductOptions &options) {
    Validate(directory, options);
    CreateFolder(directory);
    GeneratedProduct product{directory, PathIn(directory, "product.xml"), {}};
    for (const std::string &polarization : options.polarizations)
        product.imageFiles.push_back(
            PathIn(directory, ImageFileName(polarization)));

    WriteProductXml(product.productXml, options);
    if (options.lookupTables)
        for (const CalibrationKind &kind : calibrationKinds)
            WriteLookupTableFile(PathIn(directory, kind.fileName), options,
                                 kind.name);
    if (options.images)
        for (size_t i = 0; i < product.imageFiles.size(); ++i)
            WriteImage(product.imageFiles[i], options, static_cast<int>(i));
    if (options.sideFile)
        WriteSideFile(PathIn(directory, "ProductDescription.self"), options);
    return product;
}

} // namespace rs2gen
