#include "driver/OperationTable.hpp"

#include "driver/DatasetEntry.hpp"
#include "driver/DatasetLifecycle.hpp"
#include "driver/DatasetNames.hpp"
#include "driver/FileInventory.hpp"
#include "driver/OpenDatasets.hpp"
#include "driver/SegmentDirectory.hpp"
#include "host/ErrorReports.hpp"
#include "host/RasterServices.hpp"
#include "host/TextServices.hpp"
#include "product/CalibrationTables.hpp"
#include "services/OrbitSegment.hpp"

#include <cstring>

// Every operation that takes a handle checks, in this order, its mode, its
// segment number and the handle; an unknown handle gets the operation's
// neutral result without a report. Then it makes one forwarding call.

namespace {

constexpr int32_t kErrSegment = 11;
constexpr size_t kDescriptionLength = 80;
constexpr int32_t kRFBlockLength = 3584;

void RequireSegmentOne(int32_t segment) {
    if (segment != 1)
        IMPError(kErrSegment, 0, "invalid segment number");
}

// Copies at most 80 characters; byte 80 always ends the text.
void CopyDescription(char *buffer, const char *text) {
    std::strncpy(buffer, text ? text : "", kDescriptionLength);
    buffer[kDescriptionLength] = '\0';
}

void IntegerChannelRead(FILE *handle, int32_t mode, int32_t xOffset,
                        int32_t yOffset, int32_t xSize, int32_t ySize,
                        int32_t *buffer, int32_t bufferXSize,
                        int32_t bufferYSize, int32_t channelCount,
                        const int32_t *channelList) {
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return;
    entry->ReadIntegerChannels(mode, xOffset, yOffset, xSize, ySize, buffer,
                               bufferXSize, bufferYSize, channelCount,
                               channelList);
}

void RealChannelRead(FILE *handle, int32_t mode, int32_t xOffset,
                     int32_t yOffset, int32_t xSize, int32_t ySize,
                     float *buffer, int32_t bufferXSize, int32_t bufferYSize,
                     int32_t channelCount, const int32_t *channelList) {
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return;
    entry->ReadRealChannels(mode, xOffset, yOffset, xSize, ySize, buffer,
                            bufferXSize, bufferYSize, channelCount,
                            channelList);
}

int32_t DescribeChannel(FILE *handle, int32_t mode, int32_t channel,
                        char *buffer) {
    if (mode != 0)
        return 0;
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return 1;
    CopyDescription(buffer, entry->ChannelDescription(channel));
    return 1;
}

void DescribeObject(FILE *handle, int32_t mode, int32_t objectType,
                    int32_t objectNumber, char *buffer) {
    if (mode != 0)
        return;
    if (objectType != 1) {
        DescribeSegmentObject(objectType, objectNumber, buffer);
        return;
    }
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return;
    CopyDescription(buffer, entry->ProductTypeEntry());
}

int32_t FindSegment(FILE *handle, int32_t segmentType, int32_t previous) {
    if (FindDatasetEntry(handle) == nullptr)
        return -1;
    return FindSegmentNumber(segmentType, previous);
}

int32_t ReadProjection(FILE *handle, int32_t mode, ProjInfo_t *record) {
    if (mode != 0)
        return 0;
    InitProjInfo(record, 0);
    if (DatasetEntry *entry = FindDatasetEntry(handle))
        entry->GeoReference(record);
    return DecodeGeosys(record->geosys, nullptr);
}

void ReadGcpSegment(FILE *handle, int32_t mode, int32_t segment, int32_t *count,
                    char *pixelUnits, char *groundGeosys, char *elevationUnits,
                    char *groundUnits, int32_t *ids, double *pixels,
                    double *lines, double *pixelHeights, double *longitudes,
                    double *latitudes, double *heights) {
    if (mode != 0)
        return;
    RequireSegmentOne(segment);
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return;
    entry->GcpSegment(count, pixelUnits, groundGeosys, elevationUnits,
                      groundUnits, ids, pixels, lines, pixelHeights, longitudes,
                      latitudes, heights);
}

char **ReadMetadata(FILE *handle, int32_t mode, int32_t objectType,
                    int32_t objectNumber, char **list) {
    if (mode != 0)
        return nullptr;
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return list;
    switch (objectType) {
    case 1:
        return entry->FileMetadata(list);
    case 2:
        return entry->ChannelMetadata(objectNumber, list);
    case 181:
        return entry->IncidenceAngleMetadata(list);
    default:
        return list;
    }
}

void ReadOrbitSegment(FILE *handle, int32_t mode, int32_t segment,
                      EphemerisSeg_t *destination) {
    if (mode != 0)
        return;
    RequireSegmentOne(segment);
    DatasetEntry *entry = FindDatasetEntry(handle);
    ServeOrbit(handle, entry ? entry->GetOrbit() : nullptr, destination);
}

void ReadBinarySegment(FILE *handle, int32_t mode, int32_t segment,
                       int32_t offset, int32_t length, unsigned char *buffer) {
    if (mode != 0)
        IMPError(kErrSegment, 0, "%s",
                 _("Writing of binary segment not supported.\n"));
    RequireSegmentOne(segment);
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return;
    entry->RpcBinarySegment(offset, length, buffer);
}

int32_t BinarySegmentLength(FILE *handle, int32_t segment) {
    RequireSegmentOne(segment);
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return kRFBlockLength;
    return entry->RpcBinaryLength();
}

void IncidenceArraySegment(FILE *handle, int32_t mode, int32_t,
                           int32_t *dimensionCount, int32_t *valueCount,
                           double **values, char *name) {
    if (mode != 0)
        return;
    DatasetEntry *entry = FindDatasetEntry(handle);
    if (entry == nullptr)
        return;
    entry->IncidenceArraySegment(dimensionCount, valueCount, values, name);
}

} // namespace

void FillOperationTable(DriverTable *table) {
    table->RawSizeInfo = &RawSizeInfo;
    table->RawChanType = &RawChanType;
    table->IntegerChannelRead = &IntegerChannelRead;
    table->RealChannelRead = &RealChannelRead;
    table->DescribeChannel = &DescribeChannel;
    table->CloseDataset = &CloseDataset;
    table->OpenDataset = &OpenDataset;
    table->DescribeObject = &DescribeObject;
    table->FindSegment = &FindSegment;
    table->OpenTextSegment = &OpenTextSegment;
    table->ReadTextLine = &ReadTextLine;
    table->ReadProjection = &ReadProjection;
    table->ReadGcpSegment = &ReadGcpSegment;
    table->ReadMetadata = &ReadMetadata;
    table->ReadOrbitSegment = &ReadOrbitSegment;
    table->ReadBinarySegment = &ReadBinarySegment;
    table->BinarySegmentLength = &BinarySegmentLength;
    table->IncidenceArraySegment = &IncidenceArraySegment;
    table->ListCalibrationTypes = &ListCalibrationTypes;
    table->NormalizeDatasetName = &NormalizeDatasetName;
    table->ListImageFiles = &ListImageFiles;
    table->BrowseImageFile = &BrowseImageFile;
    table->ListAuxiliaryFiles = &ListAuxiliaryFiles;
}
