#include "host/ModelSegments.hpp"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <memory>

namespace {

// Byte offsets of the RF block (the table in ModelSegments.hpp).
constexpr char kMagic[8] = {'R', 'F', 'M', 'O', 'D', 'E', 'L', '1'};
constexpr int32_t kLayoutVersion = 1;
constexpr size_t kMagicOffset = 0;
constexpr size_t kVersionOffset = 8;
constexpr size_t kWidthOffset = 12;
constexpr size_t kHeightOffset = 16;
constexpr size_t kScalarsOffset = 24;
constexpr size_t kCoefficientsOffset = 104;
constexpr size_t kSensorNameOffset = 744;
constexpr size_t kGeosysOffset = 808;
constexpr size_t kProjectionGeosysOffset = 825;
constexpr size_t kProjectionTransformOffset = 848;
constexpr size_t kProjectionParmsOffset = 896;
constexpr size_t kLayoutEnd = kProjectionParmsOffset + kProjParmCount * 8;

// The scalars in the order the block stores them (the struct's order).
constexpr double RFInfo_t::*kScalars[] = {
    &RFInfo_t::longitudeOffset, &RFInfo_t::longitudeScale,
    &RFInfo_t::latitudeOffset,  &RFInfo_t::latitudeScale,
    &RFInfo_t::heightOffset,    &RFInfo_t::heightScale,
    &RFInfo_t::pixelOffset,     &RFInfo_t::pixelScale,
    &RFInfo_t::lineOffset,      &RFInfo_t::lineScale,
};
constexpr size_t kScalarCount = sizeof kScalars / sizeof kScalars[0];

// The polynomials in the order the block stores them (the struct's order).
constexpr double *RFInfo_t::*kPolynomials[] = {
    &RFInfo_t::pixelNumeratorCoefficients,
    &RFInfo_t::pixelDenominatorCoefficients,
    &RFInfo_t::lineNumeratorCoefficients,
    &RFInfo_t::lineDenominatorCoefficients,
};

static_assert(kScalarsOffset + kScalarCount * 8 == kCoefficientsOffset);
static_assert(kCoefficientsOffset + 4 * kRFBlockCoefficients * 8 ==
              kSensorNameOffset);
static_assert(kSensorNameOffset + kRFSensorNameSize == kGeosysOffset);
static_assert(kGeosysOffset + kGeosysTextSize == kProjectionGeosysOffset);
static_assert(kProjectionGeosysOffset + kGeosysTextSize <=
              kProjectionTransformOffset);
static_assert(kProjectionTransformOffset + 6 * 8 == kProjectionParmsOffset);
static_assert(kLayoutEnd <= static_cast<size_t>(kRFBlockSize));

struct RecordDeleter {
    void operator()(RFInfo_t *record) const { RFDeallocate(record); }
};
using RecordOwner = std::unique_ptr<RFInfo_t, RecordDeleter>;

template <typename T> T *ZeroedArray(size_t count) {
    return static_cast<T *>(std::calloc(count, sizeof(T)));
}

template <size_t N> void PutLittleEndian(unsigned char *at, uint64_t value) {
    for (size_t i = 0; i < N; ++i)
        at[i] = static_cast<unsigned char>(value >> (8 * i));
}

template <size_t N> uint64_t GetLittleEndian(const unsigned char *at) {
    uint64_t value = 0;
    for (size_t i = 0; i < N; ++i)
        value |= static_cast<uint64_t>(at[i]) << (8 * i);
    return value;
}

void PutInt32(unsigned char *at, int32_t value) {
    PutLittleEndian<4>(at, static_cast<uint32_t>(value));
}

int32_t GetInt32(const unsigned char *at) {
    return static_cast<int32_t>(static_cast<uint32_t>(GetLittleEndian<4>(at)));
}

void PutDouble(unsigned char *at, double value) {
    uint64_t bits = 0;
    std::memcpy(&bits, &value, sizeof bits);
    PutLittleEndian<8>(at, bits);
}

double GetDouble(const unsigned char *at) {
    uint64_t bits = GetLittleEndian<8>(at);
    double value = 0.0;
    std::memcpy(&value, &bits, sizeof value);
    return value;
}

void PutDoubles(unsigned char *at, const double *values, size_t count) {
    for (size_t i = 0; i < count; ++i)
        PutDouble(at + 8 * i, values[i]);
}

void GetDoubles(const unsigned char *at, double *values, size_t count) {
    for (size_t i = 0; i < count; ++i)
        values[i] = GetDouble(at + 8 * i);
}

// Texts travel zero-padded in fixed fields; a text filling its field loses
// its last character so that the decoded copy is always terminated.
void PutText(unsigned char *at, const char *text, size_t fieldSize) {
    if (text != nullptr)
        std::memcpy(at, text, strnlen(text, fieldSize - 1));
}

void GetText(const unsigned char *at, char *text, size_t fieldSize) {
    std::memcpy(text, at, fieldSize - 1);
    text[fieldSize - 1] = '\0';
}

void PutProjection(unsigned char *block, const ProjInfo_t &projection) {
    PutText(block + kProjectionGeosysOffset, projection.geosys,
            kGeosysTextSize);
    PutDoubles(block + kProjectionTransformOffset, projection.transform, 6);
    PutDoubles(block + kProjectionParmsOffset, projection.parms,
               kProjParmCount);
}

void GetProjection(const unsigned char *block, ProjInfo_t &projection) {
    GetText(block + kProjectionGeosysOffset, projection.geosys,
            kGeosysTextSize);
    GetDoubles(block + kProjectionTransformOffset, projection.transform, 6);
    GetDoubles(block + kProjectionParmsOffset, projection.parms,
               kProjParmCount);
}

size_t PolynomialOffset(size_t polynomial) {
    return kCoefficientsOffset + polynomial * kRFBlockCoefficients * 8;
}

void PutPolynomials(unsigned char *block, const RFInfo_t &record) {
    const size_t stored = static_cast<size_t>(
        std::max(0, std::min(record.coefficientCount, kRFBlockCoefficients)));
    for (size_t p = 0; p < std::size(kPolynomials); ++p) {
        const double *coefficients = record.*kPolynomials[p];
        if (coefficients != nullptr)
            PutDoubles(block + PolynomialOffset(p), coefficients, stored);
    }
}

bool HasBlockHeader(const unsigned char *block, int32_t length) {
    return block != nullptr && length >= kRFBlockSize &&
           std::memcmp(block + kMagicOffset, kMagic, sizeof kMagic) == 0 &&
           GetInt32(block + kVersionOffset) == kLayoutVersion;
}

} // namespace

RFInfo_t *RFAllocate(void *, int32_t count) {
    if (count <= 0)
        return nullptr;
    RecordOwner record(ZeroedArray<RFInfo_t>(1));
    if (!record)
        return nullptr;
    record->coefficientCount = count;
    for (double *RFInfo_t::*polynomial : kPolynomials) {
        record.get()->*polynomial = ZeroedArray<double>(count);
        if (record.get()->*polynomial == nullptr)
            return nullptr;
    }
    record->sensorName = ZeroedArray<char>(kRFSensorNameSize);
    record->geosys = ZeroedArray<char>(kGeosysTextSize);
    record->projection = ZeroedArray<ProjInfo_t>(1);
    if (record->sensorName == nullptr || record->geosys == nullptr ||
        record->projection == nullptr)
        return nullptr;
    // The scalars pair each offset with its scale: every second one is a scale.
    for (size_t i = 1; i < kScalarCount; i += 2)
        record.get()->*kScalars[i] = 1.0;
    DecodeGeosys("LONG D000", record->geosys);
    InitProjInfo(record->projection, 0);
    return record.release();
}

void RFDeallocate(RFInfo_t *record) {
    if (record == nullptr)
        return;
    for (double *RFInfo_t::*polynomial : kPolynomials)
        std::free(record->*polynomial);
    std::free(record->sensorName);
    std::free(record->geosys);
    std::free(record->projection);
    std::free(record);
}

unsigned char *VXBRFInfoToBinary(const RFInfo_t *record, int32_t *length) {
    if (length != nullptr)
        *length = 0;
    if (record == nullptr)
        return nullptr;
    auto *block = ZeroedArray<unsigned char>(kRFBlockSize);
    if (block == nullptr)
        return nullptr;
    std::memcpy(block + kMagicOffset, kMagic, sizeof kMagic);
    PutInt32(block + kVersionOffset, kLayoutVersion);
    PutInt32(block + kWidthOffset, record->width);
    PutInt32(block + kHeightOffset, record->height);
    for (size_t i = 0; i < kScalarCount; ++i)
        PutDouble(block + kScalarsOffset + 8 * i, record->*kScalars[i]);
    PutPolynomials(block, *record);
    PutText(block + kSensorNameOffset, record->sensorName, kRFSensorNameSize);
    PutText(block + kGeosysOffset, record->geosys, kGeosysTextSize);
    if (record->projection != nullptr)
        PutProjection(block, *record->projection);
    if (length != nullptr)
        *length = kRFBlockSize;
    return block;
}

RFInfo_t *VXBBinaryToRFInfo(const unsigned char *block, int32_t length) {
    if (!HasBlockHeader(block, length))
        return nullptr;
    RFInfo_t *record = RFAllocate(nullptr, kRFBlockCoefficients);
    if (record == nullptr)
        return nullptr;
    record->width = GetInt32(block + kWidthOffset);
    record->height = GetInt32(block + kHeightOffset);
    for (size_t i = 0; i < kScalarCount; ++i)
        record->*kScalars[i] = GetDouble(block + kScalarsOffset + 8 * i);
    for (size_t p = 0; p < std::size(kPolynomials); ++p)
        GetDoubles(block + PolynomialOffset(p), record->*kPolynomials[p],
                   kRFBlockCoefficients);
    GetText(block + kSensorNameOffset, record->sensorName, kRFSensorNameSize);
    GetText(block + kGeosysOffset, record->geosys, kGeosysTextSize);
    GetProjection(block, *record->projection);
    return record;
}
