#include "model/ZirOdi2CalibImage.hpp"

#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/GeoTiffImage.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "host/fileio/File.hpp"
#include "model/ProductFolder.hpp"

#include <cstdlib>
#include <cstring>
#include <string>

namespace {

// Code of the warnings the model reports; loading and reading go on.
constexpr int32_t kWarningCode = -1;

// Replaces a held host string by a copy of text. The copy is made first so
// that a text pointing into the old one survives.
void ReplaceHostString(char *&held, const char *text) {
    char *copy = HString(text);
    std::free(held);
    held = copy;
}

// Replaces a tie-point array by a copy of count values from source.
bool CopyTieArray(double *&target, const double *source, int32_t count) {
    if (count <= 0 || source == nullptr)
        return false;
    auto *copy = static_cast<double *>(HCalloc(count, sizeof(double)));
    if (copy == nullptr)
        return false;
    std::memcpy(copy, source, sizeof(double) * count);
    std::free(target);
    target = copy;
    return true;
}

// Why an opened image cannot serve its band, or null when it can. The reads
// hand every sample to the caller in an int32 word or a float: complex
// products pack in-phase and quadrature as two 16-bit halves of one word, so
// anything wider would be cut; detected samples must fit an int32 exactly.
const char *LayoutMisfit(FILE *image, bool complex) {
    int32_t format = 0, bits = 0, samples = 0;
    VXBSampleLayout(image, &format, &bits, &samples);
    if (complex) {
        const bool pairs = format == kSamplesComplexInteger && bits == 32;
        const bool twoSamples =
            format == kSamplesSigned && bits == 16 && samples >= 2;
        return pairs || twoSamples
                   ? nullptr
                   : "a complex product's samples must be pairs of 16-bit "
                     "integers";
    }
    const bool unsignedFits = format == kSamplesUnsigned && bits <= 16;
    const bool signedFits = format == kSamplesSigned && bits <= 32;
    return unsignedFits || signedFits
               ? nullptr
               : "a detected product's samples must be integers of at most "
                 "32 signed bits";
}

// Warns why a band's image is not opened and keeps the reason for the
// reads, which report it when the band is asked for.
FILE *RefuseBand(BandRecord &band, const std::string &reason) {
    IMPError(kWarningCode, host::kWarning, "%s", reason.c_str());
    band.failure = reason;
    return nullptr;
}

// The image of the lowest-numbered channel that has one: channel 1's image
// gives the dataset its size, and when it cannot be opened the next one
// does, so that the channels with images stay readable.
FILE *SizingImage(ZirOdi2CalibImage &model) {
    const int32_t count = model.ChannelCount();
    for (int32_t number = 1; number <= count; ++number) {
        ChannelRecord *channel = model.FindChannel(number);
        if (channel == nullptr || channel->band == nullptr)
            continue;
        if (FILE *image = model.OpenBand(*channel->band))
            return image;
    }
    return nullptr;
}

} // namespace

ZirOdi2CalibImage::ZirOdi2CalibImage()
    : calibrationTable(std::make_unique<LookupTable>()),
      incidenceTable(std::make_unique<LookupTable>()) {}

ZirOdi2CalibImage::~ZirOdi2CalibImage() {
    std::free(productDirectory);
    std::free(calibrationType);
    std::free(azimuthLooks);
    std::free(rangeLooks);
    calibrationTable.reset();
    incidenceTable.reset();
    for (auto &entry : bands) {
        std::free(entry.second->fileName);
        if (entry.second->imageHandle != nullptr)
            VXBClose(entry.second->imageHandle);
        delete entry.second;
    }
    bands.clear();
    for (auto &entry : channels) {
        std::free(entry.second->description);
        delete entry.second;
    }
    channels.clear();
    DestroyStringList(metadata);
    std::free(tieLines);
    std::free(tiePixels);
    std::free(tieLatitudes);
    std::free(tieLongitudes);
    std::free(tieHeights);
    // The record's state vectors and attitudes are arrays of their own.
    VXBSatEphemerisFree(orbit);
}

void ZirOdi2CalibImage::SetProductDirectory(const char *path) {
    std::free(productDirectory);
    productDirectory = nullptr;
    if (path == nullptr)
        return;
    try {
        productDirectory =
            HString(orv::core::fileio::File(path).GetPath().c_str());
    } catch (const orv::Exception &) {
        // Without a directory, image and table names stay relative.
    }
}

void ZirOdi2CalibImage::SetCalibrationType(const char *name) {
    ReplaceHostString(calibrationType, name);
}

void ZirOdi2CalibImage::SetAzimuthLooks(const char *text) {
    ReplaceHostString(azimuthLooks, text);
}

void ZirOdi2CalibImage::SetRangeLooks(const char *text) {
    ReplaceHostString(rangeLooks, text);
}

void ZirOdi2CalibImage::SetMetadata(char *const *list) {
    // The texts of the old list are host strings too: free() on the array
    // alone would leak them.
    char **copy = DuplicateStringList(list);
    DestroyStringList(metadata);
    metadata = copy;
}

bool ZirOdi2CalibImage::SetTieLines(const double *source) {
    return CopyTieArray(tieLines, source, tiePointCount);
}

bool ZirOdi2CalibImage::SetTiePixels(const double *source) {
    return CopyTieArray(tiePixels, source, tiePointCount);
}

bool ZirOdi2CalibImage::SetTieLatitudes(const double *source) {
    return CopyTieArray(tieLatitudes, source, tiePointCount);
}

bool ZirOdi2CalibImage::SetTieLongitudes(const double *source) {
    return CopyTieArray(tieLongitudes, source, tiePointCount);
}

bool ZirOdi2CalibImage::SetTieHeights(const double *source) {
    return CopyTieArray(tieHeights, source, tiePointCount);
}

void ZirOdi2CalibImage::SetOrbit(EphemerisSeg_t *orbitIn) {
    if (orbitIn != orbit)
        VXBSatEphemerisFree(orbit);
    orbit = orbitIn;
}

void ZirOdi2CalibImage::AddBand(int32_t polarization, const char *fileName) {
    auto found = bands.find(polarization);
    if (found != bands.end()) {
        ReplaceHostString(found->second->fileName, fileName);
        // A refusal was about the old name; the new one gets its own try.
        found->second->openFailed = false;
        return;
    }
    auto record = std::make_unique<BandRecord>();
    record->polarization = polarization;
    record->fileName = HString(fileName);
    bands.emplace(polarization, record.get());
    record.release();
}

BandRecord *ZirOdi2CalibImage::FindBand(int32_t polarization) const {
    auto found = bands.find(polarization);
    return found != bands.end() ? found->second : nullptr;
}

FILE *ZirOdi2CalibImage::OpenBand(BandRecord &band) {
    if (band.imageHandle != nullptr || band.openFailed)
        return band.imageHandle;
    // A handle that could not be had is never retried, so the warning about
    // the file is not repeated on every request; the mark is set first so
    // that an open that throws is not retried either.
    band.openFailed = true;
    // A band without a file name has no image; the product directory alone
    // names no image file.
    if (band.fileName == nullptr || *band.fileName == '\0')
        return nullptr;
    const ProductFile file =
        ResolveProductFile(productDirectory, band.fileName);
    if (file.place != ProductFilePlace::Inside)
        return RefuseBand(band, UnreadableProductFileText(file));
    // Only the host's own image reader may serve a band: any other file,
    // another product's description among them, would be opened as a whole
    // dataset of its own, with sample layouts the reads do not expect.
    if (!host::HasTiffSignature(file.path))
        return RefuseBand(band,
                          "cannot open " + file.path + ": not a TIFF image");
    const std::size_t warningCount = host::Warnings().size();
    FILE *image = VXBOpen(file.path.c_str(), "r");
    if (image == nullptr) {
        const std::vector<std::string> warnings = host::Warnings();
        band.failure = warnings.size() > warningCount
                           ? warnings.back()
                           : "cannot open " + file.path;
        return nullptr;
    }
    const bool complex = productType == static_cast<int32_t>(ProductType::SLC);
    if (const char *misfit = LayoutMisfit(image, complex)) {
        VXBClose(image);
        return RefuseBand(band, "cannot read " + file.path + ": " + misfit);
    }
    band.imageHandle = image;
    band.openFailed = false;
    return image;
}

ChannelRecord *ZirOdi2CalibImage::NewChannel(int32_t polarization,
                                             const char *description,
                                             int32_t bandChannel,
                                             int32_t kind) const {
    auto *record = new ChannelRecord();
    record->band = FindBand(polarization);
    record->description = HString(description);
    record->bandChannel = bandChannel;
    record->kind = kind;
    return record;
}

void ZirOdi2CalibImage::SetChannel(int32_t number, ChannelRecord *record) {
    if (record == nullptr)
        return;
    auto found = channels.find(number);
    if (found != channels.end()) {
        if (found->second == record)
            return;
        std::free(found->second->description);
        delete found->second;
        found->second = record;
        return;
    }
    std::unique_ptr<ChannelRecord> owned(record);
    channels.emplace(number, record);
    owned.release();
}

void ZirOdi2CalibImage::EnsureChannels() {
    if (channelsDefined != 0)
        return;
    DefineChannels();
    channelsDefined = 1;
}

int32_t ZirOdi2CalibImage::ChannelCount() {
    EnsureChannels();
    return static_cast<int32_t>(channels.size());
}

ChannelRecord *ZirOdi2CalibImage::FindChannel(int32_t number) const {
    auto found = channels.find(number);
    return found != channels.end() ? found->second : nullptr;
}

int32_t ZirOdi2CalibImage::Width() {
    FILE *image = SizingImage(*this);
    return image != nullptr ? VXBChanXSize(image) : 0;
}

int32_t ZirOdi2CalibImage::Height() {
    FILE *image = SizingImage(*this);
    return image != nullptr ? VXBChanYSize(image) : 0;
}

void ZirOdi2CalibImage::ResizeCalibrationTable(size_t n) {
    if (calibrationTable)
        calibrationTable->Resize(n);
}

void ZirOdi2CalibImage::SetCalibrationOffset(float value) {
    if (calibrationTable)
        calibrationTable->SetOffset(value);
}

void ZirOdi2CalibImage::SetCalibrationValue(size_t i, float value) {
    if (calibrationTable)
        calibrationTable->Set(i, value);
}

void ZirOdi2CalibImage::ResizeIncidenceTable(size_t n) {
    if (incidenceTable)
        incidenceTable->Resize(n);
}

void ZirOdi2CalibImage::SetIncidenceOffset(float value) {
    if (incidenceTable)
        incidenceTable->SetOffset(value);
}

void ZirOdi2CalibImage::SetIncidenceValue(size_t i, float value) {
    if (incidenceTable)
        incidenceTable->Set(i, value);
}
