#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace rs2gen {

/// What a generated product folder holds. Any combination of the switches is
/// valid, so that tests can build products that lack a part.
struct ProductOptions {
    /// SLC, SGX, SGF, SGC, SCN, SCW, SSG or SPG (matched ignoring case). Any
    /// other text is written as is and generated like an SGF product, so
    /// tests can exercise unknown product types.
    std::string productType = "SGF";
    /// Written to `polarizations` joined by single spaces; one image per
    /// entry. A name must not contain '/', as it becomes part of a file name.
    std::vector<std::string> polarizations = {"HH"};
    /// Empty: "Fine Quad Polarization" for four polarizations, else
    /// "ScanSAR Narrow" / "ScanSAR Wide" for SCN / SCW, else "Fine".
    std::string acquisitionType;
    int width = 64;  ///< pixels per line, at least 1
    int height = 48; ///< lines, at least 1
    uint32_t seed = 1;
    /// Writes lutSigma.xml, lutBeta.xml and lutGamma.xml. The three
    /// `lookupTable` elements of product.xml are written in any case.
    bool lookupTables = true;
    float lutOffset = 0.0f; ///< the `offset` of every look-up table file
    /// Writes one GeoTIFF per polarization. The `fullResolutionImageData`
    /// elements of product.xml are written in any case.
    bool images = true;
    bool packBits = false; ///< PackBits compression of the GeoTIFFs
    bool rationalFunctions = true;
    /// Tie points: the geolocation grid of product.xml and the geographic
    /// tie points of the GeoTIFFs.
    bool tiePoints = true;
    /// With `tiePoints`, false leaves the grid out of product.xml while the
    /// GeoTIFFs keep their tie points.
    bool geolocationGrid = true;
    /// Tie points per grid line and grid lines, each 1 to 100; a grid side
    /// longer than the image side is cut to one point per pixel or line.
    int tieGridColumns = 11;
    int tieGridRows = 11;
    bool sideFile = false; ///< writes ProductDescription.self
    /// Line 0 is the latest line ("Decreasing") instead of the earliest.
    bool lineTimeDecreasing = false;
    /// Pixel 0 of a line is at far range ("Decreasing") instead of near.
    bool pixelTimeDecreasing = false;
    double centerLatitude = 49.2;    ///< scene centre, degrees north
    double centerLongitude = -123.5; ///< scene centre, degrees east
};

/// Where GenerateProduct put the product.
struct GeneratedProduct {
    std::string directory;  ///< the product folder as given
    std::string productXml; ///< path of product.xml
    /// Paths of the image files that product.xml names, in polarization
    /// order; the files exist only when `ProductOptions::images` is set.
    std::vector<std::string> imageFiles;
};

/// Writes a product folder, creating it when missing. Files of the names it
/// writes are replaced; other files in the folder are left as they are.
/// Throws std::runtime_error naming the option or file at fault when the
/// options are invalid or a file cannot be written.
GeneratedProduct GenerateProduct(const std::string &directory,
                                 const ProductOptions &options);

/// Name of the image file of a polarization inside the product folder.
std::string ImageFileName(const std::string &polarization);

/// True when the options describe a single-look complex product.
bool IsComplexProduct(const ProductOptions &options);

/// The acquisition type written to product.xml (the option, or its default).
std::string AcquisitionTypeText(const ProductOptions &options);

/// The sample stored at column x, line y of the detected GeoTIFF of the
/// polarization with that index, computed independently of any file.
uint16_t DetectedSample(const ProductOptions &options, int polarizationIndex,
                        int x, int y);

/// The in-phase and quadrature samples stored at column x, line y of the
/// SLC GeoTIFF of the polarization with that index.
std::pair<int16_t, int16_t> ComplexSample(const ProductOptions &options,
                                          int polarizationIndex, int x, int y);

/// The gains of a look-up table file, one per column, exactly as its text
/// parses back to float. `kind` is "Sigma Nought", "Beta Nought" or "Gamma";
/// any other kind throws std::invalid_argument.
std::vector<float> LookupTableGains(const ProductOptions &options,
                                    const std::string &kind);

/// The offset of the look-up table file of that kind as its text parses back
/// to float; kinds as for LookupTableGains.
float LookupTableOffset(const ProductOptions &options, const std::string &kind);

/// Incidence angle in degrees at the centre of an image column; the
/// look-up table gains of that column are derived from it.
double IncidenceAngleDegrees(const ProductOptions &options, int column);

} // namespace rs2gen
