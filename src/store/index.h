// The lookup index of a document's annotation table: the ordered list as an array,
// so that the walks which would start at the head of the list (stepping through
// annotation text, the coverage tests of range splitting, the text-position shift
// of insertion, finding the text of an anchor) can find their place by binary
// search instead.
//
// The index is a cache beside the table, never a second source of truth. It is kept
// only for tables of at least ANINDEX_MIN_ENTRIES entries; smaller tables, and any
// table whose index cannot be allocated, are walked from the head as before, with the
// same results. Every change of the table tells the index from which list rank on it
// may be stale (ANIndexChangedAfter, ANIndexChanged, ANIndexForget); the index brings
// itself up to date from there the next time it is asked for. Adding in document
// order therefore extends it by one entry at a time.
//
// Binary searches rely on the ordered list being in document order of `start`, which
// every table operation keeps.
#ifndef ANNO_STORE_INDEX_H
#define ANNO_STORE_INDEX_H

#include <cstddef>
#include <cstdint>

#include "anno/anno.h"
#include "binding/instance.h"
#include "store/table.h"

// Below this many entries a walk from the head is as quick as a search, and no index
// memory is spent. The fuzz build lowers it so that small generated tables are indexed
// and every indexed walk is held against the brute-force readings.
#ifndef ANNO_INDEX_MIN_ENTRIES
#define ANNO_INDEX_MIN_ENTRIES 256
#endif
constexpr uint16_t ANINDEX_MIN_ENTRIES = ANNO_INDEX_MIN_ENTRIES;
static_assert(ANINDEX_MIN_ENTRIES >= 1, "an empty table has nothing to index");

// Header of the index block; six arrays of `capacity` slot indices follow it.
struct ANEntryIndex {
    uint32_t capacity;  // entries each array has room for (at least the table's capacity)
    uint32_t valid;     // list ranks [0, valid) are current
    uint32_t texts;     // text entries (types 5, 6) among those ranks
    uint32_t textHint;  // where in text[] the last text step searched from (a guess)
};
static_assert(sizeof(ANEntryIndex) == 16, "ANEntryIndex header is 16 bytes");

constexpr uint32_t ANINDEX_ARRAYS = 6;

// Bytes of an index block with room for `capacity` entries.
inline size_t ANIndexBlockBytes(uint32_t capacity) {
    return sizeof(ANEntryIndex) + sizeof(uint16_t) * ANINDEX_ARRAYS * capacity;
}

// The arrays of an index, by list rank r (0 = the first entry of the ordered list):
//   order[r]      the slot at rank r
//   rank[s]       the rank of slot s (current for the slots at ranks below `valid`)
//   text[k]       the slot of the k-th text entry, in list order
//   farAll[r]     of the entries at ranks 0..r, the one whose end sorts last
//   farCover[r]   the same over types 3 and 7
//   farRange[r]   the same over type 3
struct ANIndexArrays {
    uint16_t *order;
    uint16_t *rank;
    uint16_t *text;
    uint16_t *farAll;
    uint16_t *farCover;
    uint16_t *farRange;
};
ANIndexArrays ANIndexArraysOf(const ANEntryIndex *index);

// The index of the instance's table, brought up to date; null when the table is
// absent or small, or when the index cannot be allocated (the caller then walks the
// list). Allocates only through the process heap; a failed allocation frees the index
// and changes nothing else. The instance is taken as const because the index is a
// cache of its table: bringing it up to date changes no result of any operation.
ANEntryIndex *ANCurrentIndex(const ANInstance *instance);

// The ordered list changed right after `prev` (AN_NONE: at its front): a slot was
// linked in there, or entries behind it moved.
void ANIndexChangedAfter(ANInstance *instance, uint16_t prev);
// The start or end of `slot` is about to change or has changed, or the slot is about
// to leave the ordered list or move in it.
void ANIndexChanged(ANInstance *instance, uint16_t slot);
// Anything in the table may have changed.
void ANIndexForget(ANInstance *instance);
// Frees the index (with the table, and by ANDeInit).
void ANFreeIndex(ANInstance *instance);
// Bytes the index block of `instance` holds, 0 without one.
inline size_t ANIndexBytes(const ANInstance *instance) {
    return instance->index == nullptr ? 0 : ANIndexBlockBytes(instance->index->capacity);
}

// ---- Searches over a current index ------------------------------------------------

// The number of entries whose start sorts at or before `pos`: the rank of the first
// entry that starts after it.
uint32_t ANIndexRanksAtOrBefore(const ANEntryTable *table, const ANEntryIndex *index,
                                const ANPos &pos);
// The number of entries whose start sorts before `pos`.
uint32_t ANIndexRanksBefore(const ANEntryTable *table, const ANEntryIndex *index, const ANPos &pos);
// The first rank whose entry ends at or after `pos` (`valid` when none does).
uint32_t ANIndexFirstReaching(const ANEntryTable *table, const ANEntryIndex *index,
                              const ANPos &pos);

// The first entry from the head of the list that is not wholly before `pos` (it
// starts after `pos` or ends at or after it), as ANNextEntryNotBefore finds it from
// the head; AN_NONE when there is none. Searched through the index, or walked.
uint16_t ANFirstEntryNotBefore(const ANInstance *instance, const ANPos &pos);

// The first entry in list order whose start has the same plain anchor as `pos`
// (itemId and subItemId equal), or AN_NONE; searched through the index, or walked
// from the head without one.
uint16_t ANFirstAtAnchor(const ANInstance *instance, const ANPos &pos);

#endif  // ANNO_STORE_INDEX_H
