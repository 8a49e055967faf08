// Highlight style tables: a growable array of 28-byte style records.
#ifndef ANNO_STYLES_STYLES_H
#define ANNO_STYLES_STYLES_H

#include <cstdint>

#include "anno/anno.h"

struct ANStyleTable {
    ANHiliteStyle *styles;  // null until the first add
    uint16_t count;
    uint16_t capacity;
};

// Makes an empty table on the process heap; null when out of memory.
ANStyleTable *ANNewStyleTable();
// Frees the array, then the table; null is ignored.
void ANFreeStyleTable(ANStyleTable *table);

#endif  // ANNO_STYLES_STYLES_H
