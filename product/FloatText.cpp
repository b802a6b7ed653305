// The look-up tables hold many thousand numbers, which were read through an
// istringstream each; converting them that way took longer than parsing the
// files. This reads them by the same rules at a fraction of the cost: it
// takes the characters a stream takes and converts them as the standard
// library's stream does itself, with strtof in the C locale. Three ways give
// that same correctly rounded float, each for fewer numbers and faster than
// the next: the short numbers of the tables (up to 2^24 as digits, times a
// power of ten up to 10^10) by one float operation, every other number in the
// float range by from_chars, and the numbers beyond it by strtof.

#include "product/FloatText.hpp"

#include <cfloat>
#include <charconv>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <locale.h>
#include <string>

// A float operation on two floats must round once, to float: with wider
// intermediate results the short way below would round twice.
static_assert(FLT_EVAL_METHOD == 0, "float arithmetic must be done in float");

namespace {

// White space as the classic locale classifies it.
bool IsStreamSpace(char c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' ||
           c == '\r';
}

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

bool IsSign(char c) { return c == '+' || c == '-'; }

// Every integer up to 2^24 is a float, and so is every power of ten up to
// 10^10; the quotient or product of two such floats is the correctly rounded
// value of the decimal number they stand for.
constexpr std::uint64_t kExactDigits = std::uint64_t{1} << 24;
constexpr int kExactPowers = 10;
constexpr float kPowersOfTen[kExactPowers + 1] = {
    1e0f, 1e1f, 1e2f, 1e3f, 1e4f, 1e5f, 1e6f, 1e7f, 1e8f, 1e9f, 1e10f};

// The characters a stream gathers for a number: a sign, digits with at most
// one point, and, once a digit was seen, an exponent mark with its own sign
// and digits. They are gathered whether or not they form a number ("-", ".",
// "1e"); anything else ends them, so "0x10" gives "0" and "inf" gives
// nothing. Along the way the number is taken apart as digits times a power
// of ten, for as long as the digits stay small.
struct Candidate {
    const char *end = nullptr;
    bool negative = false;
    std::uint64_t digits = 0; // the digits as an integer, while exact
    int power = 0;            // the number is digits * 10^power
    bool exact = false;       // digits and power hold the number
};

Candidate GatherNumber(const char *begin, const char *end) {
    Candidate number;
    const char *c = begin;
    if (c != end && IsSign(*c))
        number.negative = *c++ == '-';
    bool anyDigit = false;
    bool point = false;
    bool small = true;
    for (; c != end && (IsDigit(*c) || (*c == '.' && !point)); ++c) {
        if (*c == '.') {
            point = true;
            continue;
        }
        anyDigit = true;
        if (number.digits > kExactDigits) {
            small = false;
            continue;
        }
        number.digits = number.digits * 10 + static_cast<unsigned>(*c - '0');
        number.power -= point ? 1 : 0;
    }
    bool exponentComplete = true;
    if (c != end && (*c == 'e' || *c == 'E') && anyDigit) {
        ++c;
        bool negativeExponent = false;
        if (c != end && IsSign(*c))
            negativeExponent = *c++ == '-';
        int exponent = 0;
        exponentComplete = false;
        for (; c != end && IsDigit(*c); ++c) {
            exponentComplete = true;
            // Beyond any float; capped so that it cannot overflow.
            if (exponent < 1000)
                exponent = exponent * 10 + (*c - '0');
        }
        number.power += negativeExponent ? -exponent : exponent;
    }
    number.end = c;
    number.exact = anyDigit && small && exponentComplete &&
                   number.digits <= kExactDigits &&
                   number.power >= -kExactPowers &&
                   number.power <= kExactPowers;
    return number;
}

float ExactValue(const Candidate &number) {
    const float digits = static_cast<float>(number.digits);
    const float value = number.power < 0 ? digits / kPowersOfTen[-number.power]
                                         : digits * kPowersOfTen[number.power];
    return number.negative ? -value : value;
}

// strtof independent of the process's locale, whose decimal point need not
// be '.'.
float StrtofClassic(const char *text, char **end) {
    static const locale_t classic =
        newlocale(LC_ALL_MASK, "C", static_cast<locale_t>(nullptr));
    if (classic == static_cast<locale_t>(nullptr))
        return std::strtof(text, end);
    return strtof_l(text, end, classic);
}

// The gathered characters [begin, begin + length) as the stream converts
// them: they must form one number whole, and a number that overflows the
// float range is refused (one that underflows gives what strtof gives).
bool ConvertLikeStream(const char *begin, std::size_t length, float *value) {
    // strtof gets the gathered characters on their own: on the text itself
    // it would read on where a stream stops ("0x10" as hexadecimal), and the
    // text need not end in a null character.
    char shortCopy[32];
    std::string longCopy;
    const char *candidate = shortCopy;
    if (length < sizeof shortCopy) {
        std::memcpy(shortCopy, begin, length);
        shortCopy[length] = '\0';
    } else {
        longCopy.assign(begin, length);
        candidate = longCopy.c_str();
    }
    char *parsedEnd = nullptr;
    const float number = StrtofClassic(candidate, &parsedEnd);
    if (parsedEnd == candidate || *parsedEnd != '\0' || std::isinf(number))
        return false;
    *value = number;
    return true;
}

} // namespace

bool ReadFloatLikeStream(std::string_view text, float *value) {
    const char *begin = text.data();
    const char *end = begin + text.size();
    while (begin != end && IsStreamSpace(*begin))
        ++begin;
    const Candidate number = GatherNumber(begin, end);
    if (number.exact) {
        *value = ExactValue(number);
        return true;
    }
    // from_chars takes no plus sign; it cannot stand before another sign.
    const char *digits =
        begin != number.end && *begin == '+' ? begin + 1 : begin;
    float converted = 0.0f;
    const std::from_chars_result result =
        std::from_chars(digits, number.end, converted);
    if (result.ec == std::errc::result_out_of_range)
        return ConvertLikeStream(
            begin, static_cast<std::size_t>(number.end - begin), value);
    if (result.ec != std::errc() || result.ptr != number.end)
        return false;
    *value = converted;
    return true;
}
