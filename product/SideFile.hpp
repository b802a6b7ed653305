#pragma once

struct ProductReader;

/// The entries of the product's ProductDescription.self side file as a new
/// host key/value list the caller destroys, or null when there is no file
/// or it holds no entry.
char **ReadSideFile(const ProductReader &reader);
