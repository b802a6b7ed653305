#include "host/TiffBlocks.hpp"

#include "host/ErrorReports.hpp"
#include "host/RasterServices.hpp"

#include <algorithm>
#include <cstring>
#include <limits>
#include <string>

namespace host {
namespace {

// How far compressed data can expand: PackBits 64 times, LZW and Deflate
// about 1400 and 1030 times, runs of one byte in zstd some 30,000 times. A
// compressed block declaring more than this many times the bytes it stores
// is refused before anything is allocated for it, so that a tiny file cannot
// claim hundreds of megabytes.
constexpr uint64_t kMaxExpansion = uint64_t(1) << 16;

struct SampleFormatEntry {
    uint16_t format;
    uint16_t bitsPerSample;
    ElementType element;
    uint32_t elementBytes;
    uint32_t elementsPerSample;
    int32_t channelType;
};

// The sample formats the reader decodes. A complex sample's BitsPerSample
// counts both halves, which are presented as two channels (real part, then
// imaginary part). 8-bit signed samples have no host channel
// type of their own and are presented as int16 channels.
constexpr SampleFormatEntry kSampleFormats[] = {
    {SAMPLEFORMAT_UINT, 8, ElementType::UInt8, 1, 1, kChanUInt8},
    {SAMPLEFORMAT_UINT, 16, ElementType::UInt16, 2, 1, kChanUInt16},
    {SAMPLEFORMAT_UINT, 32, ElementType::UInt32, 4, 1, kChanUInt32},
    {SAMPLEFORMAT_INT, 8, ElementType::Int8, 1, 1, kChanInt16},
    {SAMPLEFORMAT_INT, 16, ElementType::Int16, 2, 1, kChanInt16},
    {SAMPLEFORMAT_INT, 32, ElementType::Int32, 4, 1, kChanInt32},
    {SAMPLEFORMAT_IEEEFP, 32, ElementType::Float32, 4, 1, kChanFloat32},
    {SAMPLEFORMAT_COMPLEXINT, 32, ElementType::Int16, 2, 2, kChanInt16},
    {SAMPLEFORMAT_COMPLEXINT, 64, ElementType::Int32, 4, 2, kChanInt32},
    {SAMPLEFORMAT_COMPLEXIEEEFP, 64, ElementType::Float32, 4, 2, kChanFloat32},
};

void ReadSampleFormat(const TiffFile &file, TiffLayout &layout) {
    uint16_t format = file.UInt16Field(TIFFTAG_SAMPLEFORMAT, SAMPLEFORMAT_UINT);
    const uint16_t bits = file.UInt16Field(TIFFTAG_BITSPERSAMPLE, 1);
    if (format == SAMPLEFORMAT_VOID)
        format = SAMPLEFORMAT_UINT;
    for (const SampleFormatEntry &entry : kSampleFormats) {
        if (entry.format == format && entry.bitsPerSample == bits) {
            layout.element = entry.element;
            layout.elementBytes = entry.elementBytes;
            layout.elementsPerSample = entry.elementsPerSample;
            layout.channelType = entry.channelType;
            layout.sampleFormat = format;
            layout.bitsPerSample = bits;
            return;
        }
    }
    file.Fail(std::to_string(bits) + "-bit samples of sample format " +
              std::to_string(format) + " are not supported");
}

void CheckPhotometric(const TiffFile &file) {
    if (file.UInt16Field(TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK) !=
        PHOTOMETRIC_YCBCR)
        return;
    uint16_t horizontal = 1;
    uint16_t vertical = 1;
    TIFFGetFieldDefaulted(file.Handle(), TIFFTAG_YCBCRSUBSAMPLING, &horizontal,
                          &vertical);
    if (horizontal != 1 || vertical != 1)
        file.Fail("YCbCr subsampled data is not supported");
}

void CheckCompression(const TiffFile &file, TiffLayout &layout) {
    const uint16_t compression =
        file.UInt16Field(TIFFTAG_COMPRESSION, COMPRESSION_NONE);
    if (!TIFFIsCODECConfigured(compression))
        file.Fail("compression scheme " + std::to_string(compression) +
                  " is not available");
    layout.compressed = compression != COMPRESSION_NONE;
}

int32_t ImageExtent(const TiffFile &file, ttag_t tag) {
    const uint32_t extent = file.UInt32Field(tag, 0);
    if (extent == 0 || extent > uint32_t(std::numeric_limits<int32_t>::max()))
        file.Fail("image size " + std::to_string(extent) + " is not supported");
    return static_cast<int32_t>(extent);
}

uint32_t CeilDivide(uint32_t value, uint32_t divisor) {
    return value / divisor + (value % divisor != 0 ? 1 : 0);
}

void ReadBlockGrid(const TiffFile &file, TiffLayout &layout) {
    const auto width = static_cast<uint32_t>(layout.width);
    const auto height = static_cast<uint32_t>(layout.height);
    layout.tiled = TIFFIsTiled(file.Handle()) != 0;
    if (layout.tiled) {
        layout.blockWidth = file.UInt32Field(TIFFTAG_TILEWIDTH, 0);
        layout.blockHeight = file.UInt32Field(TIFFTAG_TILELENGTH, 0);
    } else {
        layout.blockWidth = width;
        layout.blockHeight =
            std::min(file.UInt32Field(TIFFTAG_ROWSPERSTRIP, height), height);
    }
    if (layout.blockWidth == 0 || layout.blockHeight == 0)
        file.Fail("empty strips or tiles");
    layout.blocksAcross = CeilDivide(width, layout.blockWidth);
    layout.blocksDown = CeilDivide(height, layout.blockHeight);
}

// A product of declared sizes, or nothing when it exceeds limit.
bool BoundedProduct(std::initializer_list<uint64_t> factors, uint64_t limit,
                    uint64_t &product) {
    product = 1;
    for (uint64_t factor : factors)
        if (__builtin_mul_overflow(product, factor, &product) ||
            product > limit)
            return false;
    return true;
}

// What the reader assumes about the blocks must be what libtiff decodes:
// the block count, and the size of a tile or of a row of a strip.
void CheckBlockGrid(const TiffFile &file, const TiffLayout &layout) {
    // A file can declare strips or tiles of any size; a row of blocks that
    // could never fit the memory budget is refused when the file is opened.
    uint64_t rowOfBlocks = 0;
    if (!BoundedProduct(
            {layout.blocksAcross, layout.BlockBytes(), layout.PlaneCount()},
            BlockMemoryBudget(), rowOfBlocks))
        file.Fail("a row of strips or tiles would exceed the " +
                  std::to_string(BlockMemoryBudget()) +
                  "-byte memory budget for decoded blocks");
    TIFF *tif = file.Handle();
    const uint64_t blockCount =
        uint64_t(layout.blocksAcross) * layout.blocksDown * layout.PlaneCount();
    const uint64_t declaredCount =
        layout.tiled ? TIFFNumberOfTiles(tif) : TIFFNumberOfStrips(tif);
    const uint64_t rowBytes = uint64_t(layout.width) *
                              layout.ElementsPerPixel() * layout.elementBytes;
    const bool sizesAgree = layout.tiled
                                ? TIFFTileSize64(tif) == layout.BlockBytes()
                                : TIFFScanlineSize64(tif) == rowBytes;
    if (blockCount != declaredCount || !sizesAgree)
        file.Fail("strip or tile layout is inconsistent");
}

std::string BlockName(const TiffLayout &layout, uint32_t index) {
    return (layout.tiled ? "tile " : "strip ") + std::to_string(index);
}

} // namespace

int32_t TiffLayout::ChannelCount() const {
    return static_cast<int32_t>(samplesPerPixel * elementsPerSample);
}

uint32_t TiffLayout::PlaneCount() const {
    return separatePlanes ? samplesPerPixel : 1;
}

uint32_t TiffLayout::ElementsPerPixel() const {
    return separatePlanes ? elementsPerSample
                          : samplesPerPixel * elementsPerSample;
}

size_t TiffLayout::RowStride() const {
    return size_t(blockWidth) * ElementsPerPixel();
}

size_t TiffLayout::BlockStride() const { return RowStride() * blockHeight; }

uint64_t TiffLayout::BlockBytes() const {
    return uint64_t(BlockStride()) * elementBytes;
}

uint64_t TiffLayout::DecodedBytes(uint32_t blockRow) const {
    if (tiled)
        return BlockBytes();
    const uint64_t firstLine = uint64_t(blockRow) * blockHeight;
    const uint64_t lines =
        std::min<uint64_t>(blockHeight, uint64_t(height) - firstLine);
    return lines * RowStride() * elementBytes;
}

uint32_t TiffLayout::BlockIndex(uint32_t plane, uint32_t blockRow,
                                uint32_t blockColumn) const {
    return (plane * blocksDown + blockRow) * blocksAcross + blockColumn;
}

TiffLayout ReadTiffLayout(const TiffFile &file) {
    TiffLayout layout;
    layout.width = ImageExtent(file, TIFFTAG_IMAGEWIDTH);
    layout.height = ImageExtent(file, TIFFTAG_IMAGELENGTH);
    layout.samplesPerPixel = file.UInt16Field(TIFFTAG_SAMPLESPERPIXEL, 1);
    if (layout.samplesPerPixel == 0)
        file.Fail("no samples per pixel");
    layout.separatePlanes =
        file.UInt16Field(TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) ==
        PLANARCONFIG_SEPARATE;
    ReadSampleFormat(file, layout);
    CheckPhotometric(file);
    CheckCompression(file, layout);
    ReadBlockGrid(file, layout);
    CheckBlockGrid(file, layout);
    return layout;
}

TiffBlockCache::TiffBlockCache(const TiffFile &fileIn,
                               const TiffLayout &layoutIn)
    : file(fileIn), layout(layoutIn), entries(layoutIn.PlaneCount()) {}

void TiffBlockCache::Reserve(const std::vector<bool> &neededPlanes) {
    for (uint32_t plane = 0; plane < layout.PlaneCount(); ++plane)
        if (neededPlanes[plane])
            ReserveEntry(entries[plane]);
}

void TiffBlockCache::ReserveEntry(Entry &entry) {
    if (entry.bytes.Data() != nullptr)
        return;
    const uint64_t rowBytes = layout.blocksAcross * layout.BlockBytes();
    if (!entry.bytes.Allocate(rowBytes))
        throw ReportedError(
            kErrUnreadableFile, kError,
            file.Path() + ": decoding a row of its strips or tiles needs " +
                std::to_string(rowBytes) + " bytes, more than the " +
                std::to_string(BlockMemoryLeft()) + " left of the " +
                std::to_string(BlockMemoryBudget()) +
                "-byte memory budget for decoded blocks of all open images");
    entry.held.assign(layout.blocksAcross, StoredBlock{});
}

const unsigned char *
TiffBlockCache::Load(uint32_t plane, uint32_t blockRow,
                     const std::vector<bool> &neededColumns) {
    Entry &entry = entries[plane];
    ReserveEntry(entry);
    for (uint32_t column = 0; column < layout.blocksAcross; ++column)
        if (neededColumns[column])
            Fill(entry, plane, blockRow, column);
    return entry.bytes.Data();
}

TiffBlockCache::StoredBlock TiffBlockCache::Stored(uint32_t plane,
                                                   uint32_t blockRow,
                                                   uint32_t blockColumn) const {
    const uint32_t index = layout.BlockIndex(plane, blockRow, blockColumn);
    int failed = 0;
    StoredBlock block;
    block.offset = TIFFGetStrileOffsetWithErr(file.Handle(), index, &failed);
    block.byteCount =
        TIFFGetStrileByteCountWithErr(file.Handle(), index, &failed);
    block.decodedBytes = failed ? 0 : layout.DecodedBytes(blockRow);
    return block;
}

// Puts the decoded block (blockRow, blockColumn) into its slot of the row,
// decoding it only when no slot holds the same stored block already.
void TiffBlockCache::Fill(Entry &entry, uint32_t plane, uint32_t blockRow,
                          uint32_t blockColumn) {
    const StoredBlock wanted = Stored(plane, blockRow, blockColumn);
    StoredBlock &held = entry.held[blockColumn];
    if (wanted.decodedBytes != 0 && held == wanted)
        return;
    unsigned char *slot =
        entry.bytes.Data() + blockColumn * layout.BlockBytes();
    held = StoredBlock{}; // until the slot holds a whole block again
    const auto same = std::find(entry.held.begin(), entry.held.end(), wanted);
    if (wanted.decodedBytes != 0 && same != entry.held.end()) {
        const auto column = static_cast<size_t>(same - entry.held.begin());
        std::memcpy(slot, entry.bytes.Data() + column * layout.BlockBytes(),
                    wanted.decodedBytes);
    } else {
        Decode(plane, blockRow, blockColumn, slot);
    }
    held = wanted;
}

void TiffBlockCache::Decode(uint32_t plane, uint32_t blockRow,
                            uint32_t blockColumn, unsigned char *into) const {
    TIFF *tif = file.Handle();
    const uint32_t index = layout.BlockIndex(plane, blockRow, blockColumn);
    const auto expected = static_cast<tmsize_t>(layout.DecodedBytes(blockRow));
    const tmsize_t decoded =
        layout.tiled ? TIFFReadEncodedTile(tif, index, into, expected)
                     : TIFFReadEncodedStrip(tif, index, into, expected);
    if (decoded != expected)
        file.Fail("cannot decode " + BlockName(layout, index));
}

void TiffBlockCache::CheckStoredInFile(
    const std::vector<uint32_t> &blockRows,
    const std::vector<bool> &neededPlanes,
    const std::vector<bool> &neededColumns) const {
    const uint64_t fileSize = file.FileSize();
    for (uint32_t plane = 0; plane < layout.PlaneCount(); ++plane)
        for (uint32_t blockRow : blockRows)
            for (uint32_t column = 0; column < layout.blocksAcross; ++column)
                if (neededPlanes[plane] && neededColumns[column])
                    CheckBlockStored(plane, blockRow, column, fileSize);
}

void TiffBlockCache::CheckBlockStored(uint32_t plane, uint32_t blockRow,
                                      uint32_t blockColumn,
                                      uint64_t fileSize) const {
    TIFF *tif = file.Handle();
    const uint32_t index = layout.BlockIndex(plane, blockRow, blockColumn);
    int failed = 0;
    const uint64_t offset = TIFFGetStrileOffsetWithErr(tif, index, &failed);
    const uint64_t stored = TIFFGetStrileByteCountWithErr(tif, index, &failed);
    const uint64_t decoded = layout.DecodedBytes(blockRow);
    const bool inFile =
        !failed && offset <= fileSize && stored <= fileSize - offset;
    if (!inFile || (!layout.compressed && stored < decoded))
        file.Fail(BlockName(layout, index) +
                  " lies beyond the end of the file");
    if (layout.compressed && (stored == 0 || decoded / kMaxExpansion > stored))
        file.Fail(BlockName(layout, index) + " stores " +
                  std::to_string(stored) + " bytes, too few to hold the " +
                  std::to_string(decoded) + " it declares");
}

} // namespace host
