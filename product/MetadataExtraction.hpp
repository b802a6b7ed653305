#pragma once

#include <xercesc/dom/DOMDocument.hpp>

struct ProductReader;
class ZirOdi2CalibImage;

/// Builds the product's metadata list and geolocation tie points from the
/// product description and hands them to the model.
void ExtractProductMetadata(ProductReader &reader,
                            const xercesc::DOMDocument *document,
                            ZirOdi2CalibImage *model);
/// Seconds of day of a date-time text ("2010-05-08T12:00:01.5Z").
double SecondsOfDay(const char *text);
