#pragma once

#include "model/ProductTypes.hpp"

#include <xercesc/dom/DOMDocument.hpp>

class ZirOdi2CalibImage;

/// Registers one band per recognised polarization of the product. A band
/// whose image file name leads out of the product folder is registered
/// without a file, after a warning naming it.
void ReadPolarizations(const xercesc::DOMDocument *document,
                       ZirOdi2CalibImage *model);
/// Polarization code of a name (whole text, any case); Unknown for null.
Polarization PolarizationFromName(const char *name);
/// Image file name of a polarization as a host string the caller frees, or
/// null when no fullResolutionImageData element names it.
char *ImageFileForPolarization(const xercesc::DOMDocument *document,
                               const char *polarization);
