#pragma once

#include "host/BlockMemoryBudget.hpp"
#include "host/TiffFile.hpp"

#include <cstddef>
#include <cstdint>
#include <vector>

namespace host {

/// The scalar type of the elements a file stores. A complex-integer sample is
/// two elements (in-phase, quadrature) of the integer type of its halves.
enum class ElementType { UInt8, Int8, UInt16, Int16, UInt32, Int32, Float32 };

/// How a TIFF stores its samples: in blocks (strips, or tiles) of blockWidth
/// x blockHeight pixels, in one plane or one plane per sample. A strip is a
/// block as wide as the image. Inside a decoded block, pixels follow each
/// other row by row, each ElementsPerPixel() elements long.
struct TiffLayout {
    int32_t width = 0;  // pixels
    int32_t height = 0; // lines
    ElementType element = ElementType::UInt8;
    uint32_t elementBytes = 1;
    uint32_t elementsPerSample = 1; // 2 for complex integers
    uint32_t samplesPerPixel = 1;
    int32_t channelType = 0; // ChannelTypeCode of every channel
    // As the file declares them (a void sample format reads as unsigned):
    // complex samples count both halves in bitsPerSample.
    uint16_t sampleFormat = SAMPLEFORMAT_UINT;
    uint16_t bitsPerSample = 8;
    bool separatePlanes = false;
    bool tiled = false;
    bool compressed = false;
    uint32_t blockWidth = 0;  // pixels
    uint32_t blockHeight = 0; // lines
    uint32_t blocksAcross = 0;
    uint32_t blocksDown = 0;

    int32_t ChannelCount() const;
    uint32_t PlaneCount() const;
    /// Elements of one pixel inside a block of one plane.
    uint32_t ElementsPerPixel() const;
    /// Elements from one row of a block to the next.
    size_t RowStride() const;
    /// Elements from one block of a decoded row of blocks to the next.
    size_t BlockStride() const;
    /// Bytes of one full block of one plane.
    uint64_t BlockBytes() const;
    /// Bytes libtiff decodes for block row blockRow (the last strip of an
    /// image may be shorter than the others; tiles are always whole).
    uint64_t DecodedBytes(uint32_t blockRow) const;
    /// libtiff's number of the block (plane, blockRow, blockColumn).
    uint32_t BlockIndex(uint32_t plane, uint32_t blockRow,
                        uint32_t blockColumn) const;
};

/// The layout of the file's first image. Throws host::ReportedError naming
/// the file when the layout is one the reader does not decode: sample formats
/// other than 8/16/32-bit integers, 32-bit floats and 16/32-bit complex
/// integers (BitsPerSample 32/64), YCbCr subsampling, a codec libtiff lacks,
/// or blocks whose decoded row alone would exceed the process's memory
/// budget for decoded blocks (see BlockMemoryBudget.hpp).
TiffLayout ReadTiffLayout(const TiffFile &file);

/// Decodes rows of blocks and keeps the last one of every plane, so that
/// consecutive lines of the same strips or tiles are decoded once. Memory:
/// one row of blocks per plane, i.e. one row of blocks of the image, charged
/// to the process's budget for decoded blocks until the cache is destroyed.
/// Blocks are known by where they are stored: a block stored where one the
/// cache holds was stored (same offset, byte count and decoded size) is not
/// decoded again, so a file whose blocks all share one stream costs one
/// decoding, not one per block.
class TiffBlockCache {
  public:
    TiffBlockCache(const TiffFile &fileIn, const TiffLayout &layoutIn);

    /// Allocates the rows of blocks of the flagged planes. Throws
    /// host::ReportedError naming the file when the budget for decoded blocks
    /// cannot hold them, std::bad_alloc when the system cannot.
    void Reserve(const std::vector<bool> &neededPlanes);

    /// The decoded row of blocks blockRow of plane, with at least the blocks
    /// flagged in neededColumns decoded; valid until the next call. Throws
    /// host::ReportedError when libtiff cannot decode a block, or when the
    /// plane's row of blocks cannot be allocated (see Reserve).
    const unsigned char *Load(uint32_t plane, uint32_t blockRow,
                              const std::vector<bool> &neededColumns);

    /// Throws host::ReportedError unless every flagged block of the given
    /// rows and planes lies whole inside the file and, when compressed,
    /// stores enough bytes to expand to its declared size. For uncompressed
    /// data this is what decoding them needs, short of an I/O error.
    void CheckStoredInFile(const std::vector<uint32_t> &blockRows,
                           const std::vector<bool> &neededPlanes,
                           const std::vector<bool> &neededColumns) const;

  private:
    // Where a block's data is stored, and how much of it is decoded.
    struct StoredBlock {
        uint64_t offset = 0;
        uint64_t byteCount = 0;
        uint64_t decodedBytes = 0; // 0: the slot holds no decoded block
        bool operator==(const StoredBlock &other) const {
            return offset == other.offset && byteCount == other.byteCount &&
                   decodedBytes == other.decodedBytes;
        }
    };
    struct Entry {
        BudgetedBytes bytes;           // one row of blocks
        std::vector<StoredBlock> held; // per block column
    };
    void ReserveEntry(Entry &entry);
    StoredBlock Stored(uint32_t plane, uint32_t blockRow,
                       uint32_t blockColumn) const;
    void Fill(Entry &entry, uint32_t plane, uint32_t blockRow,
              uint32_t blockColumn);
    void Decode(uint32_t plane, uint32_t blockRow, uint32_t blockColumn,
                unsigned char *into) const;
    void CheckBlockStored(uint32_t plane, uint32_t blockRow,
                          uint32_t blockColumn, uint64_t fileSize) const;

    const TiffFile &file;
    const TiffLayout &layout;
    std::vector<Entry> entries; // one per plane
};

} // namespace host
