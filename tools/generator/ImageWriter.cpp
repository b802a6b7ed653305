#include "tools/generator/ImageWriter.hpp"

#include "tools/generator/SampleField.hpp"
#include "tools/generator/SceneGeometry.hpp"

#include <geotiff.h>
#include <geovalues.h>
#include <tiffio.h>
#include <xtiffio.h>

#include <cstdarg>
#include <cstdio>
#include <memory>
#include <stdexcept>
#include <vector>

namespace rs2gen {

namespace {

// Owns a TIFF opened for writing. libtiff reports its problems with this
// file to the object, which keeps the last one for the exception text,
// rather than to the process's standard error.
class TiffFile {
  public:
    TiffFile(const std::string &pathIn, bool bigTiff) : path(pathIn) {
        // Registers the GeoTIFF tags with libtiff; later calls do nothing.
        XTIFFInitialize();
        const std::unique_ptr<TIFFOpenOptions, decltype(&TIFFOpenOptionsFree)>
            options(TIFFOpenOptionsAlloc(), &TIFFOpenOptionsFree);
        if (!options)
            throw std::runtime_error("cannot write " + path +
                                     ": out of memory");
        TIFFOpenOptionsSetErrorHandlerExtR(options.get(), &KeepError, this);
        TIFFOpenOptionsSetWarningHandlerExtR(options.get(), &IgnoreWarning,
                                             nullptr);
        tiff = TIFFOpenExt(path.c_str(), bigTiff ? "w8" : "w", options.get());
        Require(tiff != nullptr, "opening");
    }
    ~TiffFile() {
        if (tiff != nullptr)
            TIFFClose(tiff);
    }
    TiffFile(const TiffFile &) = delete;
    TiffFile &operator=(const TiffFile &) = delete;

    TIFF *Handle() const { return tiff; }

    void Require(bool succeeded, const char *step) const {
        if (!succeeded)
            Fail(step);
    }
    [[noreturn]] void Fail(const std::string &step) const {
        throw std::runtime_error("cannot write " + path + " (" + step + ")" +
                                 (lastError.empty() ? "" : ": " + lastError));
    }
    // Writes everything still buffered, so that failures surface here
    // rather than unnoticed in the destructor.
    void Finish() { Require(TIFFFlush(tiff) == 1, "flushing"); }

  private:
    static int KeepError(TIFF *, void *file, const char *module,
                         const char *format, va_list arguments) {
        char message[512];
        std::vsnprintf(message, sizeof message, format, arguments);
        static_cast<TiffFile *>(file)->lastError =
            std::string(module != nullptr ? module : "libtiff") + ": " +
            message;
        return 1;
    }
    // Warnings concern unusual but valid files; the writer's own choices
    // never call for one to be shown.
    static int IgnoreWarning(TIFF *, void *, const char *, const char *,
                             va_list) {
        return 1;
    }

    std::string path;
    std::string lastError;
    TIFF *tiff = nullptr;
};

void SetLayout(TiffFile &file, const ProductOptions &options, bool complex) {
    TIFF *tiff = file.Handle();
    const uint16_t samplesPerPixel = complex ? 2 : 1;
    const bool layoutSet =
        TIFFSetField(tiff, TIFFTAG_IMAGEWIDTH,
                     static_cast<uint32_t>(options.width)) == 1 &&
        TIFFSetField(tiff, TIFFTAG_IMAGELENGTH,
                     static_cast<uint32_t>(options.height)) == 1 &&
        TIFFSetField(tiff, TIFFTAG_BITSPERSAMPLE, 16) == 1 &&
        TIFFSetField(tiff, TIFFTAG_SAMPLESPERPIXEL, samplesPerPixel) == 1 &&
        TIFFSetField(tiff, TIFFTAG_SAMPLEFORMAT,
                     complex ? SAMPLEFORMAT_INT : SAMPLEFORMAT_UINT) == 1 &&
        TIFFSetField(tiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK) == 1 &&
        TIFFSetField(tiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) == 1 &&
        TIFFSetField(tiff, TIFFTAG_COMPRESSION,
                     options.packBits ? COMPRESSION_PACKBITS
                                      : COMPRESSION_NONE) == 1 &&
        TIFFSetField(tiff, TIFFTAG_ROWSPERSTRIP,
                     TIFFDefaultStripSize(tiff, 0)) == 1;
    file.Require(layoutSet, "setting the image layout");
    if (complex) {
        // The quadrature sample is the second sample of a grey image.
        const uint16_t extra[] = {EXTRASAMPLE_UNSPECIFIED};
        file.Require(TIFFSetField(tiff, TIFFTAG_EXTRASAMPLES, 1, extra) == 1,
                     "setting the extra sample");
    }
}

// One (I, J, K, X, Y, Z) tie point per grid point: the centre of its pixel,
// then longitude, latitude and height.
void SetTiePoints(TiffFile &file, const ProductOptions &options) {
    const SceneGeometry geometry(options);
    std::vector<double> tiePoints;
    for (const TiePoint &point :
         geometry.TieGrid(options.tieGridColumns, options.tieGridRows))
        tiePoints.insert(tiePoints.end(),
                         {point.pixel + 0.5, point.line + 0.5, 0.0,
                          point.ground.longitude, point.ground.latitude,
                          point.ground.height});
    file.Require(TIFFSetField(file.Handle(), TIFFTAG_GEOTIEPOINTS,
                              static_cast<int>(tiePoints.size()),
                              tiePoints.data()) == 1,
                 "setting the tie points");
}

void SetGeographicKeys(TiffFile &file) {
    const std::unique_ptr<GTIF, decltype(&GTIFFree)> keys(
        GTIFNew(file.Handle()), &GTIFFree);
    file.Require(keys != nullptr, "preparing the GeoTIFF keys");
    GTIF *gtif = keys.get();
    const double inverseFlattening =
        SceneGeometry::semiMajorAxis /
        (SceneGeometry::semiMajorAxis - SceneGeometry::semiMinorAxis);
    const bool keysSet =
        GTIFKeySet(gtif, GTModelTypeGeoKey, TYPE_SHORT, 1, ModelGeographic) &&
        GTIFKeySet(gtif, GTRasterTypeGeoKey, TYPE_SHORT, 1,
                   RasterPixelIsArea) &&
        GTIFKeySet(gtif, GeographicTypeGeoKey, TYPE_SHORT, 1, GCS_WGS_84) &&
        GTIFKeySet(gtif, GeogCitationGeoKey, TYPE_ASCII, 0, "WGS 84") &&
        GTIFKeySet(gtif, GeogAngularUnitsGeoKey, TYPE_SHORT, 1,
                   Angular_Degree) &&
        GTIFKeySet(gtif, GeogSemiMajorAxisGeoKey, TYPE_DOUBLE, 1,
                   SceneGeometry::semiMajorAxis) &&
        GTIFKeySet(gtif, GeogInvFlatteningGeoKey, TYPE_DOUBLE, 1,
                   inverseFlattening);
    file.Require(keysSet, "setting the GeoTIFF keys");
    file.Require(GTIFWriteKeys(gtif) == 1, "writing the GeoTIFF keys");
}

// Fills one line at a time through `samplesAt(x, y, samples)`, which
// writes the samples of pixel (x, y).
template <typename Sample, typename SamplesAt>
void WriteLines(TiffFile &file, const ProductOptions &options,
                int samplesPerPixel, SamplesAt samplesAt) {
    std::vector<Sample> line(static_cast<size_t>(options.width) *
                             samplesPerPixel);
    for (int y = 0; y < options.height; ++y) {
        for (int x = 0; x < options.width; ++x)
            samplesAt(x, y, &line[static_cast<size_t>(x) * samplesPerPixel]);
        if (TIFFWriteScanline(file.Handle(), line.data(),
                              static_cast<uint32_t>(y), 0) != 1)
            file.Fail("writing line " + std::to_string(y));
    }
}

} // namespace

void WriteImage(const std::string &path, const ProductOptions &options,
                int polarizationIndex) {
    const bool complex = IsComplexProduct(options);
    const SampleField field(options, polarizationIndex);
    // Classic TIFF addresses at most 4 GiB; keep a margin for the tags.
    const unsigned long long imageBytes =
        static_cast<unsigned long long>(options.width) * options.height *
        (complex ? 4 : 2);
    TiffFile file(path, imageBytes > 0xF0000000ULL);
    SetLayout(file, options, complex);
    if (options.tiePoints) {
        SetTiePoints(file, options);
        SetGeographicKeys(file);
    }
    if (complex)
        WriteLines<int16_t>(file, options, 2,
                            [&](int x, int y, int16_t *samples) {
                                const auto [i, q] = field.Complex(x, y);
                                samples[0] = i;
                                samples[1] = q;
                            });
    else
        WriteLines<uint16_t>(file, options, 1,
                             [&](int x, int y, uint16_t *samples) {
                                 samples[0] = field.Detected(x, y);
                             });
    file.Finish();
}

} // namespace rs2gen
