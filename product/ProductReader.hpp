#pragma once

#include "host/ModelSegments.hpp"

class ZirOdi2CalibImage;

/// The reader of one open dataset: the path of its product description and
/// the rational-function record read from it. Lives as long as the dataset.
struct ProductReader {
    ProductReader() = default;
    ~ProductReader();
    ProductReader(const ProductReader &) = delete;
    ProductReader &operator=(const ProductReader &) = delete;

    char *productPath = nullptr;           // host string, freed with the reader
    RFInfo_t *rationalFunctions = nullptr; // released with RFDeallocate
};

/// Parses the product description at path and returns a new model of the
/// class that fits the product, filled; null when the product cannot be
/// loaded. Throws orv::Exception "Unknown product type". The caller owns the
/// model and deletes it through its virtual destructor.
ZirOdi2CalibImage *LoadProduct(ProductReader &reader, const char *path,
                               const char *calibrationOption);
