#include "services/OrbitSegment.hpp"

#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/HostMemory.hpp"
#include "host/RasterServices.hpp"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

namespace {

struct EphemerisDeleter {
    void operator()(EphemerisSeg_t *record) const {
        VXBSatEphemerisFree(record);
    }
};
using EphemerisKeeper = std::unique_ptr<EphemerisSeg_t, EphemerisDeleter>;
struct HandleDeleter {
    void operator()(FILE *handle) const { fpDealloc(handle); }
};

// The arrays a served record received; the record itself is the caller's.
struct ServedArrays {
    EphemerisSeg_t record{};
    ~ServedArrays() {
        std::free(record.stateVectors);
        std::free(record.attitudes);
    }
};

EphemerisKeeper SampleOrbit() {
    host::HostList list(
        SetAuxEntry(nullptr, "SatPositions",
                    "2017-04-30T08:00:00.000000Z;1;2;3;4;5;6;"
                    "2017-04-30T08:00:10.000000Z;11;12;13;14;15;16;"));
    list.reset(SetAuxEntry(list.release(), "SatAttitudes",
                           "28800;0.1;0.2;0.3;28810;0.4;0.5;0.6;"));
    return EphemerisKeeper(GetOrbitPtr(list.get(), nullptr));
}

} // namespace

TEST(ServeOrbit, gives_each_request_a_record_of_its_own) {
    EphemerisKeeper orbit = SampleOrbit();
    ASSERT_NE(orbit, nullptr);
    ASSERT_EQ(orbit->stateVectorCount, 2);
    ServedArrays second;
    {
        ServedArrays first;
        ServeOrbit(nullptr, orbit.get(), &first.record);
        ServeOrbit(nullptr, orbit.get(), &second.record);
        ASSERT_EQ(first.record.stateVectorCount, 2);
        EXPECT_NE(first.record.stateVectors, orbit->stateVectors);
        EXPECT_NE(first.record.stateVectors, second.record.stateVectors);
        EXPECT_NE(first.record.attitudes, second.record.attitudes);
        // Scribbling over the first copy before releasing it must reach
        // neither the second nor the model's record.
        first.record.stateVectors[1].position[0] = -1.0;
        first.record.attitudes[0].yaw = -1.0;
    }
    const EphemerisSeg_t *intact[] = {&second.record, orbit.get()};
    for (const EphemerisSeg_t *record : intact) {
        ASSERT_EQ(record->stateVectorCount, 2);
        ASSERT_EQ(record->attitudeCount, 2);
        EXPECT_STREQ(record->stateVectors[1].time,
                     "2017-04-30T08:00:10.000000Z");
        EXPECT_EQ(record->stateVectors[1].position[0], 11.0);
        EXPECT_EQ(record->stateVectors[1].velocity[2], 16.0);
        EXPECT_EQ(record->attitudes[0].yaw, 0.1);
        EXPECT_EQ(record->attitudes[1].pitch, 0.6);
    }
}

TEST(ServeOrbit, reports_error_23_naming_the_dataset_without_an_orbit) {
    std::unique_ptr<FILE, HandleDeleter> handle(
        fpAlloc("/data/scene/product.xml", 192, nullptr));
    ASSERT_NE(handle, nullptr);
    struct Case {
        FILE *handle;
        std::string message;
    } cases[] = {
        {handle.get(), "No orbit information for `/data/scene/product.xml'."},
        {nullptr, "No orbit information for `'."}, // unknown handle
    };
    for (const Case &c : cases) {
        EphemerisSeg_t destination{};
        destination.stateVectorCount = 99;
        try {
            ServeOrbit(c.handle, nullptr, &destination);
            ADD_FAILURE() << "no report for " << c.message;
        } catch (const host::ReportedError &error) {
            EXPECT_EQ(error.code, 23);
            EXPECT_EQ(error.reportClass, host::kSevere);
            EXPECT_EQ(std::string(error.what()), c.message);
        }
        EXPECT_EQ(destination.stateVectorCount, 99);
        EXPECT_EQ(destination.stateVectors, nullptr);
    }
}

TEST(GetOrbitPtr, refuses_state_vectors_it_cannot_read_and_drops_attitudes) {
    const char *const positions[] = {
        nullptr, // no entry
        "",
        "2017-04-30T08:00:00.000000Z;1;2;3;4;5;", // six fields
        "2017-04-30;1;2;3;4;5;6;",                // no time of day
        "2017-04-30T08:00:00.000000Z;1;2;x;4;5;6;",
    };
    for (const char *text : positions) {
        host::HostList list(text ? SetAuxEntry(nullptr, "SatPositions", text)
                                 : nullptr);
        EXPECT_THROW(GetOrbitPtr(list.get(), nullptr), orv::DataException)
            << (text ? text : "no entry");
    }
    // Malformed attitudes cost only the attitudes.
    host::HostList list(SetAuxEntry(
        nullptr, "SatPositions", "2017-04-30T08:00:00.000000Z;1;2;3;4;5;6;"));
    list.reset(SetAuxEntry(list.release(), "SatAttitudes", "28800;0.1;x;0.3;"));
    EphemerisKeeper orbit(GetOrbitPtr(list.get(), nullptr));
    ASSERT_NE(orbit, nullptr);
    EXPECT_EQ(orbit->stateVectorCount, 1);
    EXPECT_EQ(orbit->attitudeCount, 0);
}
