#include "host/ModelSegments.hpp"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

namespace {

struct RecordKeeper {
    void operator()(RFInfo_t *record) const { RFDeallocate(record); }
};
using Record = std::unique_ptr<RFInfo_t, RecordKeeper>;

struct BlockKeeper {
    void operator()(unsigned char *block) const { std::free(block); }
};
using Block = std::unique_ptr<unsigned char, BlockKeeper>;

Block Encode(const RFInfo_t &record) {
    int32_t length = -1;
    Block block(VXBRFInfoToBinary(&record, &length));
    EXPECT_EQ(length, kRFBlockSize);
    return block;
}

double *Polynomial(RFInfo_t &record, int which) {
    double *polynomials[] = {
        record.pixelNumeratorCoefficients, record.pixelDenominatorCoefficients,
        record.lineNumeratorCoefficients, record.lineDenominatorCoefficients};
    return polynomials[which];
}

std::vector<double *> Scalars(RFInfo_t &record) {
    return {&record.longitudeOffset, &record.longitudeScale,
            &record.latitudeOffset,  &record.latitudeScale,
            &record.heightOffset,    &record.heightScale,
            &record.pixelOffset,     &record.pixelScale,
            &record.lineOffset,      &record.lineScale};
}

// The scalars, the first `count` terms of the four polynomials and the
// projection numbers of a record.
std::vector<double> Numbers(RFInfo_t &record, int count) {
    std::vector<double> numbers;
    for (double *scalar : Scalars(record))
        numbers.push_back(*scalar);
    for (int p = 0; p < 4; ++p)
        numbers.insert(numbers.end(), Polynomial(record, p),
                       Polynomial(record, p) + count);
    numbers.insert(numbers.end(), record.projection->transform,
                   record.projection->transform + 6);
    numbers.insert(numbers.end(), record.projection->parms,
                   record.projection->parms + kProjParmCount);
    return numbers;
}

// Every field distinct, so that a swapped field shows.
Record DistinctRecord(int32_t count) {
    Record record(RFAllocate(nullptr, count));
    record->width = 12345;
    record->height = -7;
    int i = 0;
    for (double *scalar : Scalars(*record))
        *scalar = -1.25 + 3.5 * i++;
    for (int p = 0; p < 4; ++p)
        for (i = 0; i < count; ++i)
            Polynomial(*record, p)[i] = 1000.0 * (p + 1) + i + 0.125;
    std::strcpy(record->sensorName, "RADARSAT-2 test sensor");
    std::strcpy(record->geosys, "LONG D000");
    std::strcpy(record->projection->geosys, "UTM 10 T D000");
    for (i = 0; i < 6; ++i)
        record->projection->transform[i] = 100.0 + i;
    for (i = 0; i < kProjParmCount; ++i)
        record->projection->parms[i] = -50.0 - i;
    return record;
}

std::vector<unsigned char> Bytes(const unsigned char *at, size_t count) {
    return std::vector<unsigned char>(at, at + count);
}

TEST(ModelSegments, allocate_gives_a_neutral_record_or_null) {
    EXPECT_EQ(RFAllocate(nullptr, 0), nullptr);
    EXPECT_EQ(RFAllocate(nullptr, -3), nullptr);
    Record record(RFAllocate(nullptr, 7));
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(record->coefficientCount, 7);
    EXPECT_EQ(record->width, 0);
    // Offsets 0 and scales 1; no terms; the identity transform.
    std::vector<double> neutral = {0, 1, 0, 1, 0, 1, 0, 1, 0, 1};
    neutral.resize(10 + 4 * 7, 0.0);
    neutral.insert(neutral.end(), {0, 1, 0, 0, 0, 1});
    neutral.resize(neutral.size() + kProjParmCount, 0.0);
    EXPECT_EQ(Numbers(*record, 7), neutral);
    EXPECT_STREQ(record->sensorName, "");
    EXPECT_STREQ(record->geosys, "LONG D000");
    EXPECT_STREQ(record->projection->geosys, "PIXEL");
    RFDeallocate(nullptr);
}

TEST(ModelSegments, block_round_trips_every_field_with_twenty_terms) {
    struct Case {
        int32_t count;
        int32_t kept; // coefficients the block carries over
    };
    for (const Case &c : {Case{3, 3}, Case{20, 20}, Case{25, 20}}) {
        SCOPED_TRACE(c.count);
        Record original = DistinctRecord(c.count);
        Block block = Encode(*original);
        Record decoded(VXBBinaryToRFInfo(block.get(), kRFBlockSize));
        ASSERT_NE(decoded, nullptr);
        EXPECT_EQ(decoded->coefficientCount, kRFBlockCoefficients);
        EXPECT_EQ(decoded->width, 12345);
        EXPECT_EQ(decoded->height, -7);
        // Short arrays are padded with zeros, long ones cut.
        Record expected = DistinctRecord(kRFBlockCoefficients);
        for (int p = 0; p < 4; ++p)
            for (int i = c.kept; i < kRFBlockCoefficients; ++i)
                Polynomial(*expected, p)[i] = 0.0;
        EXPECT_EQ(Numbers(*decoded, kRFBlockCoefficients),
                  Numbers(*expected, kRFBlockCoefficients));
        EXPECT_STREQ(decoded->sensorName, "RADARSAT-2 test sensor");
        EXPECT_STREQ(decoded->geosys, "LONG D000");
        EXPECT_STREQ(decoded->projection->geosys, "UTM 10 T D000");
    }
}

TEST(ModelSegments, block_is_little_endian_at_the_documented_offsets) {
    Record record = DistinctRecord(kRFBlockCoefficients);
    record->width = 0x01020304;
    record->longitudeOffset = 1.0;                 // 3FF0000000000000
    record->pixelNumeratorCoefficients[0] = -2.0;  // C000000000000000
    record->lineDenominatorCoefficients[19] = 0.5; // 3FE0000000000000
    record->projection->transform[0] = 2.0;        // 4000000000000000
    record->projection->parms[16] = 1.5;           // 3FF8000000000000
    Block block = Encode(*record);
    const unsigned char *b = block.get();
    const std::string magic(reinterpret_cast<const char *>(b), 8);
    EXPECT_EQ(magic, "RFMODEL1");
    EXPECT_EQ(Bytes(b + 8, 4), (std::vector<unsigned char>{1, 0, 0, 0}));
    EXPECT_EQ(Bytes(b + 12, 4), (std::vector<unsigned char>{4, 3, 2, 1}));
    EXPECT_EQ(Bytes(b + 24, 8),
              (std::vector<unsigned char>{0, 0, 0, 0, 0, 0, 0xF0, 0x3F}));
    EXPECT_EQ(Bytes(b + 104, 8),
              (std::vector<unsigned char>{0, 0, 0, 0, 0, 0, 0, 0xC0}));
    EXPECT_EQ(Bytes(b + 584 + 19 * 8, 8),
              (std::vector<unsigned char>{0, 0, 0, 0, 0, 0, 0xE0, 0x3F}));
    EXPECT_STREQ(reinterpret_cast<const char *>(b + 744),
                 "RADARSAT-2 test sensor");
    EXPECT_STREQ(reinterpret_cast<const char *>(b + 808), "LONG D000");
    EXPECT_STREQ(reinterpret_cast<const char *>(b + 825), "UTM 10 T D000");
    EXPECT_EQ(Bytes(b + 848, 8),
              (std::vector<unsigned char>{0, 0, 0, 0, 0, 0, 0, 0x40}));
    EXPECT_EQ(Bytes(b + 896 + 16 * 8, 8),
              (std::vector<unsigned char>{0, 0, 0, 0, 0, 0, 0xF8, 0x3F}));
    EXPECT_EQ(Bytes(b + 1032, kRFBlockSize - 1032),
              std::vector<unsigned char>(kRFBlockSize - 1032, 0));
}

TEST(ModelSegments, texts_filling_their_field_keep_a_terminator) {
    Record record = DistinctRecord(kRFBlockCoefficients);
    std::memset(record->sensorName, 'S', kRFSensorNameSize - 1);
    record->sensorName[kRFSensorNameSize - 1] = 'X'; // no terminator at all
    Block block = Encode(*record);
    Record decoded(VXBBinaryToRFInfo(block.get(), kRFBlockSize));
    ASSERT_NE(decoded, nullptr);
    EXPECT_EQ(std::string(decoded->sensorName),
              std::string(kRFSensorNameSize - 1, 'S'));
    EXPECT_STREQ(decoded->geosys, "LONG D000");
}

TEST(ModelSegments, decoder_refuses_what_is_not_an_rf_block) {
    Record record = DistinctRecord(kRFBlockCoefficients);
    Block good = Encode(*record);
    std::vector<unsigned char> badMagic = Bytes(good.get(), kRFBlockSize);
    badMagic[7] = '2'; // "RFMODEL2"
    std::vector<unsigned char> badVersion = Bytes(good.get(), kRFBlockSize);
    badVersion[8] = 2; // layout version 2
    std::vector<unsigned char> longer = Bytes(good.get(), kRFBlockSize);
    longer.resize(kRFBlockSize + 512, 0xEE); // trailing bytes are ignored
    struct Case {
        const char *what;
        const unsigned char *block;
        int32_t length;
        bool accepted;
    };
    const Case cases[] = {
        {"valid", good.get(), kRFBlockSize, true},
        {"valid with more bytes", longer.data(), kRFBlockSize + 512, true},
        {"one byte short", good.get(), kRFBlockSize - 1, false},
        {"empty", good.get(), 0, false},
        {"null", nullptr, kRFBlockSize, false},
        {"bad magic", badMagic.data(), kRFBlockSize, false},
        {"bad version", badVersion.data(), kRFBlockSize, false},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.what);
        Record decoded(VXBBinaryToRFInfo(c.block, c.length));
        EXPECT_EQ(decoded != nullptr, c.accepted);
    }
    int32_t length = -1;
    EXPECT_EQ(VXBRFInfoToBinary(nullptr, &length), nullptr);
    EXPECT_EQ(length, 0);
}

} // namespace
