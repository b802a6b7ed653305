#pragma once

#include "host/Ephemeris.hpp"

#include <cstdio>

/// Gives destination its own copy of orbit (the arrays then belong to the
/// destination record). Without an orbit, reports error 23 naming the
/// dataset of handle.
void ServeOrbit(FILE *handle, const EphemerisSeg_t *orbit,
                EphemerisSeg_t *destination);
