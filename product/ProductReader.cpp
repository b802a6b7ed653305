#include "product/ProductReader.hpp"

#include <cstdlib>

ProductReader::~ProductReader() {
    RFDeallocate(rationalFunctions);
    std::free(productPath);
}
