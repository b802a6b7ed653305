#include "product/Bands.hpp"

#include "model/ZirOdi2CalibImage.hpp"
#include "product/DocumentAccess.hpp"
#include "product/ProductFileNames.hpp"
#include "product/TextHelpers.hpp"

void ReadPolarizations(const xercesc::DOMDocument *document,
                       ZirOdi2CalibImage *model) {
    if (document == nullptr || model == nullptr)
        return;
    HostString list(ElementText(document, "polarizations"));
    // Single spaces only: a name next to a tab or line break stays
    // unrecognised rather than guessed at.
    for (const std::string &name : SplitTokens(list.get(), " ")) {
        Polarization code = PolarizationFromName(name.c_str());
        if (code == Polarization::Unknown)
            continue;
        HostString fileName(ImageFileForPolarization(document, name.c_str()));
        // A refused name leaves the band without a file, as a polarization
        // without an image element is.
        if (!IsNameInsideProduct(fileName.get())) {
            WarnNameOutsideProduct(fileName.get());
            fileName.reset();
        }
        model->AddBand(static_cast<int32_t>(code), fileName.get());
    }
}

Polarization PolarizationFromName(const char *name) {
    static const CodeName<Polarization> kNames[] = {
        {"HH", Polarization::HH},
        {"VH", Polarization::VH},
        {"HV", Polarization::HV},
        {"VV", Polarization::VV},
    };
    return CodeFromName(name, kNames, Polarization::Unknown);
}

char *ImageFileForPolarization(const xercesc::DOMDocument *document,
                               const char *polarization) {
    return FindTextByAttribute(document, "fullResolutionImageData",
                               AttributeMatch::EqualIgnoringCase, polarization);
}
