#pragma once

#include <xercesc/dom/DOMDocument.hpp>

struct ProductReader;
class ZirOdi2CalibImage;

/// Reads the product's rational function model into the reader's record,
/// once per reader.
void ReadRationalFunctions(ProductReader &reader,
                           const xercesc::DOMDocument *document,
                           ZirOdi2CalibImage *model);
