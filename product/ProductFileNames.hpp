#pragma once

/// Whether a file name product.xml gives (an image or a look-up table) stays
/// inside the product folder once joined to it: false for an absolute name
/// and for a name with a ".." component anywhere, true otherwise (an empty
/// name included: it names nothing outside). Names are never resolved on
/// disk, so a symbolic link the product folder itself holds is followed as
/// any file of the folder is. Spaces and bytes beyond ASCII are ordinary
/// characters of a name; '/' alone separates its components.
bool IsNameInsideProduct(const char *name);

/// Reports the warning of a file name product.xml gives that
/// IsNameInsideProduct refuses; the file is then taken as missing.
void WarnNameOutsideProduct(const char *name);
