#include "driver/OpenDatasets.hpp"

std::map<FILE *, DatasetEntry *> &OpenDatasets() {
    static std::map<FILE *, DatasetEntry *> openDatasets;
    return openDatasets;
}

DatasetEntry *FindDatasetEntry(FILE *handle) {
    auto &datasets = OpenDatasets();
    auto found = datasets.lower_bound(handle);
    if (found == datasets.end() || found->first != handle)
        return nullptr;
    return found->second;
}
