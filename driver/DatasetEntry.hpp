#pragma once

#include "host/Ephemeris.hpp"
#include "host/ProjectionServices.hpp"

#include <cstdint>

struct ProductReader;
class ZirOdi2CalibImage;

/// The record of one open dataset: its reader and its product model. Each
/// forwarding operation hands its arguments unchanged to the model.
class DatasetEntry {
  public:
    DatasetEntry() = default;
    /// Destroys the reader first (the model borrows its RPC record), then
    /// the model.
    ~DatasetEntry();
    DatasetEntry(const DatasetEntry &) = delete;
    DatasetEntry &operator=(const DatasetEntry &) = delete;

    /// Loads the product description at path; true when a model resulted.
    /// Exceptions of the loader pass to the caller.
    bool Load(const char *path, const char *calibrationOption);
    ZirOdi2CalibImage *Model() const { return model; }

    void ReadIntegerChannels(int32_t mode, int32_t xOffset, int32_t yOffset,
                             int32_t xSize, int32_t ySize, int32_t *buffer,
                             int32_t bufferXSize, int32_t bufferYSize,
                             int32_t channelCount, const int32_t *channelList);
    void ReadRealChannels(int32_t mode, int32_t xOffset, int32_t yOffset,
                          int32_t xSize, int32_t ySize, float *buffer,
                          int32_t bufferXSize, int32_t bufferYSize,
                          int32_t channelCount, const int32_t *channelList);
    const char *ChannelDescription(int32_t channel);
    const char *ProductTypeEntry();
    char **FileMetadata(char **list);
    char **ChannelMetadata(int32_t channel, char **list);
    char **IncidenceAngleMetadata(char **list);
    int32_t GeoReference(ProjInfo_t *record);
    void GcpSegment(int32_t *count, char *pixelUnits, char *groundGeosys,
                    char *elevationUnits, char *groundUnits, int32_t *ids,
                    double *pixels, double *lines, double *pixelHeights,
                    double *longitudes, double *latitudes, double *heights);
    EphemerisSeg_t *GetOrbit();
    void RpcBinarySegment(int32_t offset, int32_t length,
                          unsigned char *buffer);
    int32_t RpcBinaryLength();
    void IncidenceArraySegment(int32_t *dimensionCount, int32_t *valueCount,
                               double **values, char *name);

  private:
    ProductReader *reader = nullptr;
    ZirOdi2CalibImage *model = nullptr;
};
