// Highlight style tables: a growable array of 28-byte style records, searched
// linearly by style id.
#ifndef ANNO_STYLES_STYLES_H
#define ANNO_STYLES_STYLES_H

#include <cstdint>

#include "anno/anno.h"

struct ANStyleTable {
    ANHiliteStyle *styles;  // null until the first add
    uint16_t count;
    uint16_t capacity;
};

// Slots a table gains at a time; capacities run 10, 20, ... up to 65530.
constexpr uint16_t ANSTYLE_GROWTH = 10;
// The highest capacity a 16-bit `capacity` can record.
constexpr uint32_t ANSTYLE_CAPACITY_LIMIT = 0xFFFF;
// attr2 of a record widened from the older 24-byte form, which has none.
constexpr uint16_t ANSTYLE_OLD_FORM_ATTR2 = 0xFFFF;

// Makes an empty table on the process heap; null when out of memory.
ANStyleTable *ANNewStyleTable();
// Frees the array, then the table; null is ignored.
void ANFreeStyleTable(ANStyleTable *table);

// The record with `styleId` (the first in table order), or null. A null table has none.
const ANHiliteStyle *ANFindStyle(const ANStyleTable *table, uint32_t styleId);

// Adds a 28- or 24-byte record (a 24-byte one is widened: attr2 0xFFFF, reserved 0),
// replacing all 28 bytes of the record with the same id in place. Returns 0; 15 for
// a null table or record or a size other than 28 or 24; 13 when the array cannot be
// allocated or grown, or when another record would need a capacity past 65535 (the
// table is then unchanged; replacing a present id still works).
uint32_t ANAddStyle(ANStyleTable *table, const ANHiliteStyle *style);

// Adds every record of `src`, in order, to `dest` as ANAddStyle does, ignoring each
// add's result: styles of `src` replace those of `dest` with the same id, the others
// of `dest` stay. Copying a table onto itself changes nothing. 15 for a null table,
// otherwise 0.
uint32_t ANCopyStyleTable(ANStyleTable *dest, const ANStyleTable *src);

#endif  // ANNO_STYLES_STYLES_H
