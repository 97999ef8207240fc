#ifndef QVTESTER_DESK_MEASURE_LIBRARY_TABLES_H_
#define QVTESTER_DESK_MEASURE_LIBRARY_TABLES_H_

// The library's tables of tests, slots and properties, and the desk's of codes: the one way to them for desk and
// program.

#include "core/property_table.h"
#include "core/slots.h"
#include "core/test_table.h"
#include "desk/measure/codes.h"

#endif  // QVTESTER_DESK_MEASURE_LIBRARY_TABLES_H_
