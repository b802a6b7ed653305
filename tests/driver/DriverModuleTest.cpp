#include "host/DriverRegistry.hpp"
#include "host/DriverTable.hpp"
#include "host/ErrorReports.hpp"
#include "host/ProjectionServices.hpp"
#include "host/Raster.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <cstring>
#include <dlfcn.h>
#include <functional>
#include <memory>
#include <set>
#include <sstream>
#include <string>

namespace {

// The offsets of the 23 entries the driver fills.
const std::set<size_t> kDriverOffsets = {
    0,   32,  56,  72,  128, 136, 144, 184,  208,  272,  280, 328,
    400, 808, 912, 920, 928, 944, 976, 1048, 1112, 1120, 1128};

constexpr unsigned char kSentinel = 0xA5;

struct ModuleCloser {
    void operator()(void *module) const { dlclose(module); }
};

DriverRegistrarFn LoadRegistrar(std::unique_ptr<void, ModuleCloser> &module) {
    module.reset(dlopen(RS2_DRIVER_MODULE, RTLD_NOW | RTLD_LOCAL));
    if (!module)
        return nullptr;
    return reinterpret_cast<DriverRegistrarFn>(
        dlsym(module.get(), kDriverRegistrarName));
}

std::set<size_t> ChangedWords(const DriverTable &table,
                              const DriverTable &before) {
    std::set<size_t> changed;
    const auto *now = reinterpret_cast<const unsigned char *>(&table);
    const auto *old = reinterpret_cast<const unsigned char *>(&before);
    for (size_t offset = 0; offset < sizeof(DriverTable); offset += 8)
        if (std::memcmp(now + offset, old + offset, 8) != 0)
            changed.insert(offset);
    return changed;
}

// A handle the driver never opened: any address not in its map.
FILE *const kUnknownHandle = reinterpret_cast<FILE *>(0x1234);

class RegisteredTable : public ::testing::Test {
  protected:
    void SetUp() override {
        DriverRegistrarFn registrar = LoadRegistrar(module);
        ASSERT_NE(registrar, nullptr) << dlerror();
        std::memset(&table, 0, sizeof table);
        registrar(&table);
    }
    std::unique_ptr<void, ModuleCloser> module;
    DriverTable table;
};

} // namespace

TEST(DriverRegistration, writes_exactly_the_23_entries_and_is_repeatable) {
    std::unique_ptr<void, ModuleCloser> module;
    DriverRegistrarFn registrar = LoadRegistrar(module);
    ASSERT_NE(registrar, nullptr) << dlerror();

    DriverTable table;
    std::memset(&table, kSentinel, sizeof table);
    DriverTable sentinel = table;
    registrar(&table);
    EXPECT_EQ(ChangedWords(table, sentinel), kDriverOffsets);

    DriverTable afterFirst = table;
    registrar(&table);
    EXPECT_TRUE(ChangedWords(table, afterFirst).empty());
}

TEST(DriverRegistration, module_exports_only_the_registrar) {
    std::string command =
        std::string("nm -D --defined-only '") + RS2_DRIVER_MODULE + "'";
    std::unique_ptr<FILE, decltype(&pclose)> pipe(popen(command.c_str(), "r"),
                                                  &pclose);
    ASSERT_NE(pipe, nullptr);
    std::set<std::string> symbols;
    std::array<char, 512> line{};
    while (std::fgets(line.data(), line.size(), pipe.get()) != nullptr) {
        std::istringstream fields(line.data());
        std::string address, kind, name;
        if (fields >> address >> kind >> name)
            symbols.insert(name);
    }
    EXPECT_EQ(symbols, std::set<std::string>{"REZADE2DODOZavazozi"});
}

TEST(DriverRegistration, host_loads_the_module_and_lists_its_operations) {
    host::DriverInfo driver = host::LoadedDriver();
    EXPECT_NE(driver.path.find("rs2driver"), std::string::npos);
    std::set<size_t> offsets;
    for (const auto &[name, offset] : driver.operations)
        offsets.insert(offset);
    EXPECT_EQ(offsets, kDriverOffsets);
}

TEST_F(RegisteredTable, unknown_handle_reads_and_descriptions_leave_outputs) {
    std::array<int32_t, 4> ints;
    ints.fill(-7);
    std::array<float, 4> floats;
    floats.fill(-7.0f);
    const int32_t channels[] = {1};
    table.IntegerChannelRead(kUnknownHandle, 0, 0, 0, 2, 2, ints.data(), 2, 2,
                             1, channels);
    table.RealChannelRead(kUnknownHandle, 0, 0, 0, 2, 2, floats.data(), 2, 2, 1,
                          channels);
    for (int32_t value : ints)
        EXPECT_EQ(value, -7);
    for (float value : floats)
        EXPECT_EQ(value, -7.0f);

    char buffer[81];
    std::memset(buffer, 'x', sizeof buffer);
    EXPECT_EQ(table.DescribeChannel(kUnknownHandle, 0, 1, buffer), 1);
    EXPECT_EQ(table.DescribeChannel(kUnknownHandle, 1, 1, buffer), 0);
    table.DescribeObject(kUnknownHandle, 0, 1, 0, buffer);
    EXPECT_EQ(buffer[0], 'x');
    table.CloseDataset(kUnknownHandle);
}

// The segment texts and numbers any handle gets are checked in
// SegmentDirectoryTest.

TEST_F(RegisteredTable, unknown_handle_gets_each_neutral_result) {
    ProjInfo_t record;
    std::memset(&record, 0x5A, sizeof record);
    EXPECT_EQ(table.ReadProjection(kUnknownHandle, 0, &record), kGeosysPixel);
    EXPECT_STREQ(record.geosys, "PIXEL");
    std::memset(&record, 0x5A, sizeof record);
    EXPECT_EQ(table.ReadProjection(kUnknownHandle, 1, &record), 0);
    EXPECT_EQ(static_cast<unsigned char>(record.geosys[0]), 0x5A);

    char *list[] = {nullptr};
    EXPECT_EQ(table.ReadMetadata(kUnknownHandle, 0, 1, 0, list), list);
    EXPECT_EQ(table.ReadMetadata(kUnknownHandle, 1, 1, 0, list), nullptr);

    EXPECT_EQ(table.BinarySegmentLength(kUnknownHandle, 1), 3584);

    unsigned char bytes[4] = {9, 9, 9, 9};
    table.ReadBinarySegment(kUnknownHandle, 0, 1, 0, 4, bytes);
    EXPECT_EQ(bytes[0], 9);

    int32_t dimensions = -1, count = -1;
    double *values = nullptr;
    char name[32] = "keep";
    table.IncidenceArraySegment(kUnknownHandle, 0, 1, &dimensions, &count,
                                &values, name);
    EXPECT_EQ(dimensions, -1);
    EXPECT_EQ(count, -1);
    EXPECT_EQ(values, nullptr);
    EXPECT_STREQ(name, "keep");

    int32_t gcpCount = -1;
    char texts[4][32] = {"a", "b", "c", "d"};
    int32_t ids[1] = {-1};
    double v[6][1] = {};
    table.ReadGcpSegment(kUnknownHandle, 0, 1, &gcpCount, texts[0], texts[1],
                         texts[2], texts[3], ids, v[0], v[1], v[2], v[3], v[4],
                         v[5]);
    table.ReadGcpSegment(kUnknownHandle, 1, 2, &gcpCount, texts[0], texts[1],
                         texts[2], texts[3], ids, v[0], v[1], v[2], v[3], v[4],
                         v[5]);
    EXPECT_EQ(gcpCount, -1);
    EXPECT_STREQ(texts[0], "a");
}

TEST_F(RegisteredTable, bad_requests_are_reported_with_their_codes) {
    struct Case {
        const char *what;
        std::function<void()> call;
        int32_t code;
        std::string message;
    };
    int32_t count = 0;
    char text[32];
    int32_t ids[1];
    double v[1];
    unsigned char bytes[8];
    EphemerisSeg_t orbit{};
    const Case cases[] = {
        {"gcp segment 2",
         [&] {
             table.ReadGcpSegment(kUnknownHandle, 0, 2, &count, text, text,
                                  text, text, ids, v, v, v, v, v, v);
         },
         11, "invalid segment number"},
        {"binary write",
         [&] { table.ReadBinarySegment(kUnknownHandle, 1, 1, 0, 8, bytes); },
         11, "Writing of binary segment not supported.\n"},
        {"binary segment 2",
         [&] { table.ReadBinarySegment(kUnknownHandle, 0, 2, 0, 8, bytes); },
         11, "invalid segment number"},
        {"length of segment 0",
         [&] { table.BinarySegmentLength(kUnknownHandle, 0); }, 11,
         "invalid segment number"},
        {"orbit segment 2",
         [&] { table.ReadOrbitSegment(kUnknownHandle, 0, 2, &orbit); }, 11,
         "invalid segment number"},
        {"orbit of an unknown handle",
         [&] { table.ReadOrbitSegment(kUnknownHandle, 0, 1, &orbit); }, 23,
         "No orbit information for `'."},
        {"open for writing", [&] { table.OpenDataset("x.xml", "w"); }, 43,
         "access: w"},
    };
    for (const Case &c : cases) {
        try {
            c.call();
            ADD_FAILURE() << c.what << ": no report";
        } catch (const host::ReportedError &error) {
            EXPECT_EQ(error.code, c.code) << c.what;
            EXPECT_EQ(std::string(error.what()), c.message) << c.what;
        }
    }
    // A mode other than read is refused silently where no report is due.
    table.ReadOrbitSegment(kUnknownHandle, 1, 2, &orbit);
    EXPECT_EQ(orbit.stateVectors, nullptr);
}

TEST_F(RegisteredTable, drives_open_read_segments_and_close_through_the_table) {
    rs2test::TempDir folder;
    rs2gen::ProductOptions options;
    options.polarizations = {"HH", "HV"};
    options.width = 40;
    options.height = 30;
    rs2gen::GeneratedProduct product =
        rs2gen::GenerateProduct(folder.Path(), options);

    FILE *handle = table.OpenDataset(product.productXml.c_str(), "r");
    ASSERT_NE(handle, nullptr);
    int32_t width = 0, height = 0, channels = 0;
    table.RawSizeInfo(handle, &width, &height, &channels);
    EXPECT_EQ(width, 40);
    EXPECT_EQ(height, 30);
    EXPECT_EQ(channels, 2);
    EXPECT_EQ(table.RawChanType(handle, 1), 3); // uncalibrated detected

    // Channel 2 (HV) at column 5, line 7, and channel 1 (HH) beside it.
    const int32_t list[] = {2, 1};
    float samples[2] = {};
    table.RealChannelRead(handle, 0, 5, 7, 1, 1, samples, 1, 1, 2, list);
    EXPECT_EQ(samples[0], rs2gen::DetectedSample(options, 1, 5, 7));
    EXPECT_EQ(samples[1], rs2gen::DetectedSample(options, 0, 5, 7));

    EXPECT_EQ(table.FindSegment(handle, 214, 0), 1);
    char name[81] = {};
    table.DescribeObject(handle, 0, 1, 0, name);
    EXPECT_STREQ(name, "ProductType: SGF");

    table.CloseDataset(handle);
    // Closed: the handle is unknown again, and a second close does nothing.
    EXPECT_EQ(table.FindSegment(handle, 214, 0), -1);
    table.CloseDataset(handle);
}
