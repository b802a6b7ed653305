#pragma once

#include <cstdint>

constexpr int kEphemerisTimeSize = 32;

struct StateVector_t {
    char time[kEphemerisTimeSize]; // date-time text as the product gives it
    double seconds;                // seconds of day of that time
    double position[3];            // metres, Earth-fixed
    double velocity[3];            // metres per second
};

struct AttitudeSample_t {
    double seconds;          // seconds of day
    double yaw, roll, pitch; // degrees
};

/// An orbit record. The arrays are malloc'ed; a plain record assignment
/// moves their ownership with the pointers.
struct EphemerisSeg_t {
    int32_t stateVectorCount;
    StateVector_t *stateVectors;
    int32_t attitudeCount;
    AttitudeSample_t *attitudes;
};
