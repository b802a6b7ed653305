#pragma once

#include "host/DriverTable.hpp"

/// Writes the driver's 23 operations into their entries of table and
/// touches no other entry.
void FillOperationTable(DriverTable *table);
