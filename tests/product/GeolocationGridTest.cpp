#include "product/MetadataExtraction.hpp"

#include "host/StringLists.hpp"
#include "host/TextServices.hpp"
#include "model/ProductVariants.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <string>

namespace {

// printf's "%f" of value: the form of every number of the grid and of the
// attitude times.
std::string Fixed(double value) {
    char buffer[400];
    std::snprintf(buffer, sizeof buffer, "%f", value);
    return buffer;
}

// The metadata entry key of a product description with body inside
// <product>.
std::string EntryOf(const std::string &body, const char *key) {
    rs2test::TempDir dir;
    const std::string path = rs2test::WriteFile(
        dir.File("product.xml"),
        "<?xml version=\"1.0\"?>\n<product>" + body + "</product>\n");
    ProductReader reader;
    reader.productPath = HString(path.c_str());
    ZirOdi2SLC model;
    DocumentParse parse(path.c_str());
    EXPECT_NE(parse.Document(), nullptr);
    ExtractProductMetadata(reader, parse.Document(), &model);
    const char *value = FetchAuxEntry(model.GetMetadata(), key);
    return value != nullptr ? value : "<absent>";
}

// Numbers whose "%f" form is easy to get wrong: signs of zero and of
// not-a-number, infinities, ties at the sixth decimal (to even), the largest
// and smallest doubles, and numbers that round up across a power of ten.
const char *const kNumbers[] = {
    "0",           "-0",        "0.0078125", "-0.0078125",
    "0.0234375",   "2.5e-7",    "5e-7",      "123.4567895",
    "-73.9999995", "9.9999995", "1e300",     "-1.7976931348623157e308",
    "4.9e-324",    "1e22",      "inf",       "-inf",
    "nan",         "-nan",      "45.5",      "-123.4567",
    "30465.9999",  "18464"};

TEST(GeolocationGrid, numbers_are_written_as_printf_writes_them) {
    std::string body;
    std::string expected;
    for (const char *number : kNumbers) {
        const std::string n = number;
        body += "<imageTiePoint><imageCoordinate><line>" + n +
                "</line><pixel>" + n +
                "</pixel></imageCoordinate><geodeticCoordinate><latitude>" + n +
                "</latitude><longitude>" + n + "</longitude><height>" + n +
                "</height></geodeticCoordinate></imageTiePoint>";
        for (int field = 0; field < 5; ++field)
            expected += Fixed(std::atof(number)) + ";";
    }
    EXPECT_EQ(EntryOf(body, "GeolocationGrid"), expected);
}

TEST(GeolocationGrid, attitude_seconds_are_written_as_printf_writes_them) {
    // Times of day whose seconds end in a tie at the sixth decimal, carry
    // over, or have no fraction; seconds of day are the clock's minutes in
    // seconds plus its seconds.
    struct Stamp {
        const char *text;
        int minutes;
        const char *seconds;
    } stamps[] = {
        {"2017-04-30T00:00:00.0078125Z", 0, "00.0078125"},
        {"2017-04-30T23:59:59.9999995Z", 23 * 60 + 59, "59.9999995"},
        {"2017-04-30T12:34:56Z", 12 * 60 + 34, "56Z"},
    };
    std::string body;
    std::string expected;
    for (const Stamp &stamp : stamps) {
        body += std::string("<attitudeAngles><timeStamp>") + stamp.text +
                "</timeStamp><yaw>1</yaw><roll>2</roll><pitch>3</pitch>"
                "</attitudeAngles>";
        expected += Fixed(static_cast<double>(stamp.minutes * 60) +
                          std::atof(stamp.seconds)) +
                    ";1;2;3;";
    }
    EXPECT_EQ(EntryOf(body, "SatAttitudes"), expected);
}

} // namespace
