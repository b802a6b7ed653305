#include "driver/OperationTable.hpp"

extern "C" __attribute__((visibility("default"))) void
REZADE2DODOZavazozi(DriverTable *table);

// The driver's one export: the host calls it with its table of driver
/// operations, and it fills the driver's entries.
extern "C" __attribute__((visibility("default"))) void
REZADE2DODOZavazozi(DriverTable *table) {
    FillOperationTable(table);
}
