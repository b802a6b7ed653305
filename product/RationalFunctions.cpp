#include "product/RationalFunctions.hpp"

#include "host/ModelSegments.hpp"
#include "model/ZirOdi2CalibImage.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductReader.hpp"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

namespace {

// Room the record is asked for in each coefficient array: the 20 terms of a
// cubic in latitude, longitude and height.
constexpr int32_t kCoefficientCount = 20;
constexpr const char *kSensorName = "RADARSAT-2";

struct ScalarField {
    const char *tag;
    double RFInfo_t::*field;
};

// In the order they are read.
constexpr ScalarField kScalarFields[] = {
    {"lineScale", &RFInfo_t::lineScale},
    {"pixelScale", &RFInfo_t::pixelScale},
    {"latitudeScale", &RFInfo_t::latitudeScale},
    {"longitudeScale", &RFInfo_t::longitudeScale},
    {"heightScale", &RFInfo_t::heightScale},
    {"lineOffset", &RFInfo_t::lineOffset},
    {"pixelOffset", &RFInfo_t::pixelOffset},
    {"latitudeOffset", &RFInfo_t::latitudeOffset},
    {"longitudeOffset", &RFInfo_t::longitudeOffset},
    {"heightOffset", &RFInfo_t::heightOffset},
};

struct CoefficientField {
    const char *tag;
    double *RFInfo_t::*field;
};

constexpr CoefficientField kCoefficientFields[] = {
    {"lineNumeratorCoefficients", &RFInfo_t::lineNumeratorCoefficients},
    {"lineDenominatorCoefficients", &RFInfo_t::lineDenominatorCoefficients},
    {"pixelNumeratorCoefficients", &RFInfo_t::pixelNumeratorCoefficients},
    {"pixelDenominatorCoefficients", &RFInfo_t::pixelDenominatorCoefficients},
};

std::string TextOf(const xercesc::DOMDocument *document, const char *tag) {
    return ElementTextTranscoded(document, tag).Narrow();
}

void ReadScalars(const xercesc::DOMDocument *document, RFInfo_t &record) {
    for (const ScalarField &scalar : kScalarFields) {
        const std::string text = TextOf(document, scalar.tag);
        if (!text.empty())
            record.*scalar.field = std::atof(text.c_str());
    }
}

// Pieces are split at every single space, so a doubled space stores a 0
// and shifts the later values up. Pieces beyond the room of the array are
// ignored.
void ReadCoefficients(const xercesc::DOMDocument *document, RFInfo_t &record) {
    const size_t room = static_cast<size_t>(
        std::min(record.coefficientCount, kCoefficientCount));
    for (const CoefficientField &polynomial : kCoefficientFields) {
        const std::string text = TextOf(document, polynomial.tag);
        double *values = record.*polynomial.field;
        if (text.empty() || values == nullptr)
            continue;
        const std::vector<std::string> pieces = SplitTokens(text, " ");
        const size_t stored = std::min(pieces.size(), room);
        for (size_t i = 0; i < stored; ++i)
            values[i] = std::atof(pieces[i].c_str());
    }
}

} // namespace

void ReadRationalFunctions(ProductReader &reader,
                           const xercesc::DOMDocument *document,
                           ZirOdi2CalibImage *model) {
    if (reader.rationalFunctions != nullptr)
        return;
    if (TextOf(document, "rationalFunctions").empty())
        return;
    RFInfo_t *record = RFAllocate(nullptr, kCoefficientCount);
    if (record == nullptr)
        return;
    reader.rationalFunctions = record;
    if (record->sensorName != nullptr)
        std::strcpy(record->sensorName, kSensorName);
    if (model != nullptr) {
        record->width = model->Width();
        record->height = model->Height();
    }
    ReadScalars(document, *record);
    ReadCoefficients(document, *record);
}
