#pragma once

#include "model/ZirOdi2CalibImage.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <functional>
#include <memory>

namespace rs2test {

/// A generated product in a temporary folder, loaded the way the open
/// operation loads it with the calibration choice given. `alter` may change
/// the folder's files before loading. The reader is declared before the
/// model, which borrows from it, so that it outlives the model.
struct LoadedProduct {
    using Alteration = std::function<void(const rs2gen::GeneratedProduct &)>;

    explicit LoadedProduct(const rs2gen::ProductOptions &options,
                           const char *calibration = "",
                           const Alteration &alter = {})
        : product(rs2gen::GenerateProduct(folder.Path(), options)) {
        if (alter)
            alter(product);
        model.reset(
            LoadProduct(reader, product.productXml.c_str(), calibration));
    }

    TempDir folder;
    rs2gen::GeneratedProduct product;
    ProductReader reader;
    std::unique_ptr<ZirOdi2CalibImage> model;
};

} // namespace rs2test
