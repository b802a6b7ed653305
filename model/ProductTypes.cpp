#include "model/ProductTypes.hpp"

const char *PolarizationName(int32_t polarization) {
    switch (static_cast<Polarization>(polarization)) {
    case Polarization::HH:
        return "HH";
    case Polarization::VH:
        return "VH";
    case Polarization::HV:
        return "HV";
    case Polarization::VV:
        return "VV";
    case Polarization::Unknown:
        break;
    }
    return "Unknown";
}
