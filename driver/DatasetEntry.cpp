#include "driver/DatasetEntry.hpp"

#include "model/ZirOdi2CalibImage.hpp"
#include "product/ProductReader.hpp"

DatasetEntry::~DatasetEntry() {
    delete reader;
    delete model;
}

bool DatasetEntry::Load(const char *path, const char *calibrationOption) {
    if (path == nullptr)
        return false;
    if (reader == nullptr)
        reader = new ProductReader();
    model = LoadProduct(*reader, path, calibrationOption);
    return model != nullptr;
}

void DatasetEntry::ReadIntegerChannels(int32_t mode, int32_t xOffset,
                                       int32_t yOffset, int32_t xSize,
                                       int32_t ySize, int32_t *buffer,
                                       int32_t bufferXSize, int32_t bufferYSize,
                                       int32_t channelCount,
                                       const int32_t *channelList) {
    model->ReadIntegerChannels(mode, xOffset, yOffset, xSize, ySize, buffer,
                               bufferXSize, bufferYSize, channelCount,
                               channelList);
}

void DatasetEntry::ReadRealChannels(int32_t mode, int32_t xOffset,
                                    int32_t yOffset, int32_t xSize,
                                    int32_t ySize, float *buffer,
                                    int32_t bufferXSize, int32_t bufferYSize,
                                    int32_t channelCount,
                                    const int32_t *channelList) {
    model->ReadRealChannels(mode, xOffset, yOffset, xSize, ySize, buffer,
                            bufferXSize, bufferYSize, channelCount,
                            channelList);
}

const char *DatasetEntry::ChannelDescription(int32_t channel) {
    return model->ChannelDescription(channel);
}

const char *DatasetEntry::ProductTypeEntry() {
    return model->ProductTypeEntry();
}

char **DatasetEntry::FileMetadata(char **list) {
    return model->FileMetadata(list);
}

char **DatasetEntry::ChannelMetadata(int32_t channel, char **list) {
    return model->ChannelMetadata(channel, list);
}

char **DatasetEntry::IncidenceAngleMetadata(char **list) {
    return ZirOdi2CalibImage::IncidenceAngleMetadata(list);
}

int32_t DatasetEntry::GeoReference(ProjInfo_t *record) {
    return model->GeoReference(record);
}

void DatasetEntry::GcpSegment(int32_t *count, char *pixelUnits,
                              char *groundGeosys, char *elevationUnits,
                              char *groundUnits, int32_t *ids, double *pixels,
                              double *lines, double *pixelHeights,
                              double *longitudes, double *latitudes,
                              double *heights) {
    model->GcpSegment(count, pixelUnits, groundGeosys, elevationUnits,
                      groundUnits, ids, pixels, lines, pixelHeights, longitudes,
                      latitudes, heights);
}

EphemerisSeg_t *DatasetEntry::GetOrbit() { return model->GetOrbit(); }

void DatasetEntry::RpcBinarySegment(int32_t offset, int32_t length,
                                    unsigned char *buffer) {
    model->RpcBinarySegment(offset, length, buffer);
}

int32_t DatasetEntry::RpcBinaryLength() { return model->RpcBinaryLength(); }

void DatasetEntry::IncidenceArraySegment(int32_t *dimensionCount,
                                         int32_t *valueCount, double **values,
                                         char *name) {
    model->IncidenceArraySegment(dimensionCount, valueCount, values, name);
}
