#include "host/Exception.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"

#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

namespace {

constexpr size_t kStateVectorFields = 7;
constexpr size_t kAttitudeFields = 4;

// Splits "a;b;c;" into its fields; the last ';' closes the last field.
std::vector<std::string> SemicolonFields(const char *text) {
    std::vector<std::string> fields;
    std::string current;
    for (const char *c = text; *c != '\0'; ++c) {
        if (*c == ';') {
            fields.push_back(current);
            current.clear();
        } else {
            current += *c;
        }
    }
    if (!current.empty())
        fields.push_back(current);
    return fields;
}

bool ParseNumber(const std::string &text, double *value) {
    if (text.empty())
        return false;
    char *end = nullptr;
    *value = std::strtod(text.c_str(), &end);
    return *end == '\0';
}

// Seconds of day of "YYYY-MM-DDThh:mm:ss.sss...Z".
bool ParseTimeOfDay(const std::string &text, double *seconds) {
    int hours = 0, minutes = 0;
    double secs = 0.0;
    int consumed = 0;
    if (text.size() < 19 || text[10] != 'T' ||
        std::sscanf(text.c_str() + 11, "%d:%d:%lf%n", &hours, &minutes, &secs,
                    &consumed) != 3)
        return false;
    if (hours < 0 || hours > 23 || minutes < 0 || minutes > 59 || secs < 0 ||
        secs >= 61)
        return false;
    *seconds = (hours * 60.0 + minutes) * 60.0 + secs;
    return true;
}

[[noreturn]] void ThrowBadOrbit(const std::string &why) {
    throw orv::DataException("No usable orbit: " + why, "", "", 0);
}

struct EphemerisDeleter {
    void operator()(EphemerisSeg_t *record) const {
        VXBSatEphemerisFree(record);
    }
};
using EphemerisKeeper = std::unique_ptr<EphemerisSeg_t, EphemerisDeleter>;

EphemerisKeeper NewEphemeris() {
    auto *record =
        static_cast<EphemerisSeg_t *>(std::calloc(1, sizeof(EphemerisSeg_t)));
    if (record == nullptr)
        throw std::bad_alloc();
    return EphemerisKeeper(record);
}

template <typename T> T *AllocateArray(size_t count) {
    auto *array = static_cast<T *>(std::calloc(count ? count : 1, sizeof(T)));
    if (array == nullptr)
        throw std::bad_alloc();
    return array;
}

void ReadStateVectors(const char *text, EphemerisSeg_t &record) {
    std::vector<std::string> fields = SemicolonFields(text);
    if (fields.empty())
        ThrowBadOrbit("SatPositions is empty");
    if (fields.size() % kStateVectorFields != 0)
        ThrowBadOrbit("SatPositions is not made of groups of seven fields");
    size_t count = fields.size() / kStateVectorFields;
    record.stateVectors = AllocateArray<StateVector_t>(count);
    record.stateVectorCount = static_cast<int32_t>(count);
    for (size_t i = 0; i < count; ++i) {
        const std::string *group = &fields[i * kStateVectorFields];
        StateVector_t &vector = record.stateVectors[i];
        if (group[0].size() >= kEphemerisTimeSize ||
            !ParseTimeOfDay(group[0], &vector.seconds))
            ThrowBadOrbit("bad state vector time \"" + group[0] + "\"");
        std::strcpy(vector.time, group[0].c_str());
        for (int k = 0; k < 3; ++k)
            if (!ParseNumber(group[1 + k], &vector.position[k]) ||
                !ParseNumber(group[4 + k], &vector.velocity[k]))
                ThrowBadOrbit("bad state vector number");
    }
}

// Attitude samples are a bonus to the orbit: a malformed list is left out
// rather than costing the whole orbit.
void ReadAttitudes(const char *text, EphemerisSeg_t &record) {
    std::vector<std::string> fields = SemicolonFields(text);
    if (fields.empty() || fields.size() % kAttitudeFields != 0)
        return;
    size_t count = fields.size() / kAttitudeFields;
    std::vector<AttitudeSample_t> samples(count);
    for (size_t i = 0; i < count; ++i) {
        const std::string *group = &fields[i * kAttitudeFields];
        if (!ParseNumber(group[0], &samples[i].seconds) ||
            !ParseNumber(group[1], &samples[i].yaw) ||
            !ParseNumber(group[2], &samples[i].roll) ||
            !ParseNumber(group[3], &samples[i].pitch))
            return;
    }
    record.attitudes = AllocateArray<AttitudeSample_t>(count);
    std::memcpy(record.attitudes, samples.data(),
                count * sizeof(AttitudeSample_t));
    record.attitudeCount = static_cast<int32_t>(count);
}

} // namespace

EphemerisSeg_t *GetOrbitPtr(char *const *list, const ProjInfo_t *) {
    const char *positions = FetchAuxEntry(list, "SatPositions");
    if (positions == nullptr)
        ThrowBadOrbit("no SatPositions entry");
    EphemerisKeeper record = NewEphemeris();
    ReadStateVectors(positions, *record);
    if (const char *attitudes = FetchAuxEntry(list, "SatAttitudes"))
        ReadAttitudes(attitudes, *record);
    return record.release();
}

EphemerisSeg_t *VXBSatEphemerisDuplicate(const EphemerisSeg_t *source) {
    if (source == nullptr)
        return nullptr;
    EphemerisKeeper copy = NewEphemeris();
    size_t vectors = source->stateVectors ? source->stateVectorCount : 0;
    size_t attitudes = source->attitudes ? source->attitudeCount : 0;
    copy->stateVectors = AllocateArray<StateVector_t>(vectors);
    copy->stateVectorCount = static_cast<int32_t>(vectors);
    if (vectors > 0)
        std::memcpy(copy->stateVectors, source->stateVectors,
                    vectors * sizeof(StateVector_t));
    copy->attitudes = AllocateArray<AttitudeSample_t>(attitudes);
    copy->attitudeCount = static_cast<int32_t>(attitudes);
    if (attitudes > 0)
        std::memcpy(copy->attitudes, source->attitudes,
                    attitudes * sizeof(AttitudeSample_t));
    return copy.release();
}

void VXBSatEphemerisFree(EphemerisSeg_t *record) {
    if (record == nullptr)
        return;
    std::free(record->stateVectors);
    std::free(record->attitudes);
    std::free(record);
}

bool GetSARFlippingParameters(char *const *list, bool *lineFlip,
                              bool *pixelFlip) {
    const char *pixelOrder = FetchAuxEntry(list, "pixelTimeOrdering");
    if (pixelOrder == nullptr)
        return false;
    const char *lineOrder = FetchAuxEntry(list, "lineTimeOrdering");
    if (lineFlip)
        *lineFlip =
            lineOrder != nullptr && std::strcmp(lineOrder, "Decreasing") == 0;
    if (pixelFlip)
        *pixelFlip = std::strcmp(pixelOrder, "Decreasing") == 0;
    return true;
}
