#pragma once

#include "model/ProductTypes.hpp"

#include <xercesc/dom/DOMDocument.hpp>

class ZirOdi2CalibImage;

/// ProductType of the productType element (whole text, any case).
ProductType ParseProductType(const xercesc::DOMDocument *document);
/// AcquisitionType of the acquisitionType element (whole text, any case).
AcquisitionType ParseAcquisitionType(const xercesc::DOMDocument *document);
AcquisitionType AcquisitionTypeFromName(const char *name);
/// Stores numberOfRangeLooks and numberOfAzimuthLooks in the model.
void ReadLooks(const xercesc::DOMDocument *document, ZirOdi2CalibImage *model);
