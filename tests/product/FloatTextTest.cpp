#include "product/FloatText.hpp"

#include <gtest/gtest.h>

#include <cstring>
#include <locale>
#include <random>
#include <sstream>
#include <string>
#include <string_view>

namespace {

struct StreamRead {
    bool read;
    float value;
};

// What operator>> of an istringstream in the classic locale makes of text:
// the way the gains of the look-up tables have always been read.
StreamRead ReadWithStream(const std::string &text) {
    std::istringstream stream(text);
    stream.imbue(std::locale::classic());
    float value = 0.0f;
    const bool read = static_cast<bool>(stream >> value);
    return {read, value};
}

bool SameBits(float a, float b) { return std::memcmp(&a, &b, sizeof a) == 0; }

// Compares one text with the stream; a text without a number must leave the
// value as it was.
void ExpectAsStream(const std::string &text) {
    const StreamRead expected = ReadWithStream(text);
    const float untouched = -7.25f;
    float value = untouched;
    ASSERT_EQ(ReadFloatLikeStream(text, &value), expected.read)
        << "\"" << text << "\"";
    EXPECT_TRUE(SameBits(value, expected.read ? expected.value : untouched))
        << "\"" << text << "\": " << value;
}

TEST(ReadFloatLikeStream, reads_what_stream_input_reads) {
    const char *const texts[] = {
        "", " ", "1.5", " 2", "\t\n2", "3abc", "abc", "+4", "-5e-1", ".5", "1.",
        "00012", "-0", "1.5e3x", "1E5", "1,5", "1..2", "1e5e3",
        // Words and forms a stream does not read as numbers, though strtof
        // does.
        "inf", "-inf", "infinity", "nan", "-nan", "0x10", "-0x1p3", "0x",
        // An exponent mark or sign that is not followed by digits.
        "1e", "1e+", "1e-", "5.e", "-", "+", ".", "-.e5", "+-1", "e5",
        // Beyond the float range: too large is refused, too small is 0 or a
        // subnormal number.
        "1e400", "-1e400", "3.4028236e38", "3.4028234e38", "1e-50", "7e-46",
        "1e-45", "1e-40",
        // Longer than the short copy used for strtof, in range and beyond.
        "1234567890123456789012345678901234567890.5",
        "0.0000000000000000000000000000000000000000000000000001",
        "9999999999999999999999999999999999999999999999999999",
        // Digits up to 2^24 with powers of ten up to 10^10 are converted by
        // one float operation; just beyond either bound they are not.
        "16777216", "-16777216e-10", "1677721.6e+9", "1e10", "1e11", "1e-10",
        "1e-11", "0.0000000001", "-0.0", "7.000000e-01",
        // A real gain; integers and decimals halfway between two floats
        // (rounded to the even one); the exact value of the float 0.1.
        "2.789318e+02", "16777217", "1.000000059604644775390625",
        "0.100000001490116119384765625"};
    for (const char *text : texts)
        ExpectAsStream(text);
}

TEST(ReadFloatLikeStream, gives_these_values) {
    struct Case {
        const char *text;
        bool read;
        float value;
    } cases[] = {
        {"3abc", true, 3.0f},   {" \t2", true, 2.0f}, {"+4", true, 4.0f},
        {"-5e-1", true, -0.5f}, {"0x10", true, 0.0f}, {"1e-50", true, 0.0f},
        {"inf", false, 0.0f},   {"nan", false, 0.0f}, {"1e", false, 0.0f},
        {"1e400", false, 0.0f}, {"", false, 0.0f},    {"abc", false, 0.0f},
    };
    for (const Case &c : cases) {
        float value = 0.0f;
        EXPECT_EQ(ReadFloatLikeStream(c.text, &value), c.read) << c.text;
        EXPECT_EQ(value, c.value) << c.text;
    }
}

TEST(ReadFloatLikeStream, reads_nothing_beyond_the_text) {
    const std::string text = "12e5 34";
    float value = 0.0f;
    ASSERT_TRUE(
        ReadFloatLikeStream(std::string_view(text).substr(0, 2), &value));
    EXPECT_EQ(value, 12.0f);
    // Cut after the exponent mark, the text holds no number.
    EXPECT_FALSE(
        ReadFloatLikeStream(std::string_view(text).substr(0, 3), &value));
    EXPECT_FALSE(ReadFloatLikeStream(std::string_view(), &value));
}

TEST(ReadFloatLikeStream, agrees_with_stream_input_on_random_texts) {
    // Short texts of the characters a number is made of and a few others,
    // which meet the corners of the rules far more often than real gains.
    const char alphabet[] = "0123456789.eE+- \txain";
    std::mt19937 random(20261206);
    std::uniform_int_distribution<std::size_t> length(0, 9);
    std::uniform_int_distribution<std::size_t> pick(0, sizeof alphabet - 2);
    for (int i = 0; i < 100000; ++i) {
        std::string text(length(random), ' ');
        for (char &c : text)
            c = alphabet[pick(random)];
        ExpectAsStream(text);
        if (HasFatalFailure())
            return;
    }
}

} // namespace
