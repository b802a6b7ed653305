#pragma once

#include "host/Ephemeris.hpp"
#include "host/ModelSegments.hpp"
#include "host/ProjectionServices.hpp"
#include "model/LookupTable.hpp"
#include "model/ProductTypes.hpp"

#include <cstdint>
#include <cstdio>
#include <map>
#include <memory>
#include <string>

/// The image file of one polarization.
struct BandRecord {
    int32_t polarization = 0;    // Polarization code, also its key in bands
    char *fileName = nullptr;    // host string, relative to productDirectory
    FILE *imageHandle = nullptr; // opened on first use, closed with the model
    bool openFailed = false;     // the file could not be opened; not retried
    std::string failure;         // why not: the warning reported then
};

/// One channel the dataset presents.
struct ChannelRecord {
    BandRecord *band = nullptr;  // borrowed from bands; null without image
    char *description = nullptr; // host string, "Matrix_Element: _1_1"
    int32_t bandChannel = 1;     // image-file channel of a Detected channel
    int32_t kind = 0;            // SampleKind
};

/// The product model: what the product description holds, the image file of
/// each polarization and the channels the dataset presents. Concrete product
/// variants decide the channel layout and the calibration arithmetic.
class ZirOdi2CalibImage {
  public:
    ZirOdi2CalibImage();
    virtual ~ZirOdi2CalibImage();
    ZirOdi2CalibImage(const ZirOdi2CalibImage &) = delete;
    ZirOdi2CalibImage &operator=(const ZirOdi2CalibImage &) = delete;

    /// Converts in place width x height detected samples read from the
    /// window starting at column xOffset, row yOffset.
    virtual void CalibrateDetected(int32_t xOffset, int32_t yOffset,
                                   int32_t width, int32_t height,
                                   float *samples) = 0;
    /// One value per pixel from in-phase and quadrature planes.
    virtual void CombineComplex(const float *inPhase, const float *quadrature,
                                int32_t width, int32_t height,
                                float *result) = 0;
    /// Short code of the matrix type; the caller frees the host string.
    virtual char *MatrixType() = 0;
    /// Fills channels from bands; run once through EnsureChannels.
    virtual void DefineChannels() = 0;
    /// The product's polarizations for people; the caller frees it.
    virtual char *PolarizationText() = 0;

    void SetProductType(int32_t value) { productType = value; }
    void SetAcquisitionType(int32_t value) { acquisitionType = value; }
    int32_t GetProductType() const { return productType; }
    int32_t GetAcquisitionType() const { return acquisitionType; }
    /// Stores the directory of the product description at path.
    void SetProductDirectory(const char *path);
    const char *GetProductDirectory() const { return productDirectory; }
    void SetCalibrationType(const char *name);
    const char *GetCalibrationType() const { return calibrationType; }
    void SetAzimuthLooks(const char *text);
    void SetRangeLooks(const char *text);
    const char *GetAzimuthLooks() const { return azimuthLooks; }
    const char *GetRangeLooks() const { return rangeLooks; }
    /// Keeps a copy of list.
    void SetMetadata(char *const *list);
    char *const *GetMetadata() const { return metadata; }

    void SetTiePointCount(int32_t n) { tiePointCount = n; }
    int32_t GetTiePointCount() const { return tiePointCount; }
    bool SetTieLines(const double *source);
    bool SetTiePixels(const double *source);
    bool SetTieLatitudes(const double *source);
    bool SetTieLongitudes(const double *source);
    bool SetTieHeights(const double *source);

    /// Takes ownership of orbit (released with VXBSatEphemerisFree).
    void SetOrbit(EphemerisSeg_t *orbitIn);
    EphemerisSeg_t *GetOrbit() const { return orbit; }
    /// Borrowed: the ProductReader owns the record and outlives nothing here.
    void SetRationalFunctions(RFInfo_t *record) { rationalFunctions = record; }

    void AddBand(int32_t polarization, const char *fileName);
    BandRecord *FindBand(int32_t polarization) const;
    /// The band's image file, opened on first use (null when it cannot be).
    FILE *OpenBand(BandRecord &band);
    /// A new channel record for the caller to hand to SetChannel.
    ChannelRecord *NewChannel(int32_t polarization, const char *description,
                              int32_t bandChannel, int32_t kind) const;
    /// Takes ownership of record, replacing any channel of that number.
    void SetChannel(int32_t number, ChannelRecord *record);
    void EnsureChannels();
    int32_t ChannelCount();
    int32_t Width();
    int32_t Height();
    /// The channel of that number, or null.
    ChannelRecord *FindChannel(int32_t number) const;

    LookupTable &CalibrationTable() { return *calibrationTable; }
    LookupTable &IncidenceTable() { return *incidenceTable; }
    void ResizeCalibrationTable(size_t n);
    void SetCalibrationOffset(float value);
    void SetCalibrationValue(size_t i, float value);
    void ResizeIncidenceTable(size_t n);
    void SetIncidenceOffset(float value);
    void SetIncidenceValue(size_t i, float value);

    // Requests of the raster and segment services.
    void ReadIntegerChannels(int32_t mode, int32_t xOffset, int32_t yOffset,
                             int32_t xSize, int32_t ySize, int32_t *buffer,
                             int32_t bufferXSize, int32_t bufferYSize,
                             int32_t channelCount, const int32_t *channelList);
    void ReadRealChannels(int32_t mode, int32_t xOffset, int32_t yOffset,
                          int32_t xSize, int32_t ySize, float *buffer,
                          int32_t bufferXSize, int32_t bufferYSize,
                          int32_t channelCount, const int32_t *channelList);
    void IncidenceAngles(double *out);
    void IncidenceArraySegment(int32_t *dimensionCount, int32_t *valueCount,
                               double **values, char *name);
    const char *ChannelDescription(int32_t channel);
    char **FileMetadata(char **list);
    char **ChannelMetadata(int32_t channel, char **list);
    static char **IncidenceAngleMetadata(char **list);
    const char *ProductTypeEntry() const;
    int32_t GeoReference(ProjInfo_t *record);
    void GcpSegment(int32_t *count, char *pixelUnits, char *groundGeosys,
                    char *elevationUnits, char *groundUnits, int32_t *ids,
                    double *pixels, double *lines, double *pixelHeights,
                    double *longitudes, double *latitudes, double *heights);
    void RpcBinarySegment(int32_t offset, int32_t length,
                          unsigned char *buffer);
    int32_t RpcBinaryLength();

  protected:
    const std::map<int32_t, BandRecord *> &Bands() const { return bands; }
    const std::map<int32_t, ChannelRecord *> &Channels() const {
        return channels;
    }

  private:
    std::map<int32_t, BandRecord *> bands;
    int32_t productType = static_cast<int32_t>(ProductType::Unknown);
    int32_t acquisitionType = static_cast<int32_t>(AcquisitionType::Unknown);
    std::unique_ptr<LookupTable> calibrationTable;
    std::unique_ptr<LookupTable> incidenceTable;
    char *productDirectory = nullptr;
    char *calibrationType = nullptr;
    int32_t channelsDefined = 0;
    std::map<int32_t, ChannelRecord *> channels;
    char *azimuthLooks = nullptr;
    char *rangeLooks = nullptr;
    char **metadata = nullptr;
    int32_t tiePointCount = 0;
    double *tieLines = nullptr;
    double *tiePixels = nullptr;
    double *tieLatitudes = nullptr;
    double *tieLongitudes = nullptr;
    double *tieHeights = nullptr;
    EphemerisSeg_t *orbit = nullptr;
    RFInfo_t *rationalFunctions = nullptr;
};
