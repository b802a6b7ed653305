#pragma once

#include <string>

/// Where a file name of product.xml leads once joined to the product folder.
/// The names are data of the product, not paths to be trusted: a product
/// received from elsewhere must not make the driver read a file beside or
/// above its folder (another product, a system file) under the name of one
/// of its own, whether it gets there with "..", an absolute name or a
/// symbolic link.
enum class ProductFilePlace {
    Inside,     // a regular file inside the folder, links resolved
    Missing,    // nothing there (or nothing that can be resolved)
    Outside,    // resolves to a file outside the product folder
    NotRegular, // a folder, a FIFO, a device, ...
};

struct ProductFile {
    ProductFilePlace place = ProductFilePlace::Missing;
    /// The resolved absolute path when Inside, the joined name otherwise.
    std::string path;
};

/// Resolves name against folder (a directory with its trailing '/', or
/// empty for the working directory). The name is taken byte for byte: no
/// percent escape or other decoding is applied, so what is checked is what
/// is opened.
ProductFile ResolveProductFile(const char *folder, const char *name);

/// "cannot open PATH: REASON" for a file that is not Inside, as the
/// warnings of the driver say it.
std::string UnreadableProductFileText(const ProductFile &file);
