// Looking at a document's annotation table in tests: its entries in list order, the
// annotation text at an anchor, and the checks that every mutating step must leave
// true.
#ifndef ANNO_TESTS_INVARIANTS_H
#define ANNO_TESTS_INVARIANTS_H

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

#include "anno/anno.h"
#include "store/table.h"

namespace annotest {

// The document's table, or null (no annotation state or no table).
const ANEntryTable *TableOf(DAHandle doc);

// One entry of the ordered list, copied out.
struct Listed {
    uint16_t slot;
    uint16_t type;
    uint16_t flags;
    ANAnnoRecord record;
    std::u16string text;  // type 5: its textLength units
};

// The entries of the ordered list, first to last (empty without a table).
std::vector<Listed> ListedEntries(DAHandle doc);

// The annotation text at the anchor (itemId, subItemId) of `anchor`: the units of
// the type-5 entries there in list order, a type-6 entry read as `placeholder`.
std::u16string AnchorText(DAHandle doc, const ANPos &anchor, char16_t placeholder = u'#');

// The table rules every operation keeps: both lists consistent (prev mirrors next,
// ends are AN_NONE, first/last/freeFirst/freeLast agree) and together covering every
// slot once; count is the ordered list's length; at least one free slot; capacity a
// step of 10 up to 65530; `full` only with one free slot left; every entry has a
// type 1..7 and start at or before end; starts never decrease along the ordered
// list; hasText set when a text entry is present; every type-5 entry owns a buffer
// whose capacity is a multiple of 64 above its length and keeps no caller text.
// Succeeds for a document without state or table.
::testing::AssertionResult TableInvariantsHold(DAHandle doc);

// The layout of annotation text that adding keeps: at every anchor the text entries
// (types 5 and 6, in list order) all but the last start at the kind-5 index just
// after their own units (the units of the text entries before them included), the
// last starts at the anchor's content position, and each ends one step after its
// start. Copying into a document that already has text at an anchor may leave other
// layouts; tests of adding and clearing hold to this one.
::testing::AssertionResult TextLayoutHolds(DAHandle doc);

}  // namespace annotest

#endif  // ANNO_TESTS_INVARIANTS_H
