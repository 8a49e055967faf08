// The annotation store's internal operations: ordered insertion, adding, and the
// slot and list helpers that insertion and clearing share.
//
// Table rules the helpers keep (see table.h for the records):
// - every slot is either in the ordered list or in the free list;
// - `count` is the length of the ordered list and changes only when a slot is
//   taken into the list (insertion) or released from it (ANReleaseSlot);
// - slots are taken from the front of the free list and given back at the front,
//   so never-used slots stay at its tail in increasing order;
// - after a successful insertion at least one slot is free.
#ifndef ANNO_STORE_STORE_H
#define ANNO_STORE_STORE_H

#include <cstdint>

#include "anno/anno.h"
#include "binding/instance.h"
#include "positions/order.h"
#include "store/table.h"

// Insertion modes.
constexpr uint32_t ANINSERT_ADD = 0;   // adding: text positions around new text shift
constexpr uint32_t ANINSERT_COPY = 1;  // copying from another document: positions kept
// Copying text to an anchor whose text the destination has too: positions kept, and
// the text goes into an entry of its own, never into the destination's.
constexpr uint32_t ANINSERT_COPY_APART = 2;

// Puts one annotation of `type` into the document's table at its place in document
// order; makes the table on first use and grows it by 10 slots when one free slot
// is left. Types 5 and 6 keep the annotation text of their anchor consistent (in
// ANINSERT_ADD mode the text positions of the annotations around them shift, and a
// placeholder inside a text splits it); type 5 text is appended to, or inserted
// into, the neighbouring text entry where there is one; type 3 merges into a
// touching type-3 neighbour.
// `record` must have start at or before end. The call writes it: for type 5 it
// stores a copy of `text`/`textLength` (or, when `textBuffer` is set, of that
// buffer, which the record gets back on return so a copied source stays as it was)
// and clears `text`; in ANINSERT_ADD mode it may shift the text indices of start
// and end. A new entry gets a copy of the record and `entryFlags` (ANENTRY_*).
// Returns 0 (also when merged into an existing entry), 15 (null instance or record,
// or a text position outside the annotation text at its anchor: nothing changed),
// 13 (table full: nothing changed; out of memory: a failed text allocation leaves
// texts as they were, and shifts already made stay with the list kept in document
// order). Once the new entry is linked, a growth that fails does not fail the call.
uint32_t ANInsertEntry(ANInstance *instance, uint16_t type, ANAnnoRecord *record, uint32_t mode,
                       uint16_t entryFlags);

// Adds a normalised record: orders start and end, derives the end of point types,
// hands type 3 to range splitting and inserts the entry. Unless `quiet`, the
// callback then hears notification 1 with a copy of the record as ordered (for
// type 5 still pointing at the caller's text). `entryFlags` goes to the new entry
// (ANENTRY_OWNS_USERDATA only for blocks a caller handed over). `record` may be
// changed (start and end swapped). Returns 15 (null doc or record, bad type), a
// DAGetAnno failure, 18, range splitting's failure, or ANInsertEntry's.
uint32_t ANAddRecord(DAHandle doc, uint16_t type, ANAnnoRecord *record, uint32_t quiet,
                     uint16_t entryFlags);

// ---- Table and slot helpers, shared with clearing --------------------------------

// Keeps a block a caller handed over (userData of types 1, 3, 5; 0: none) whose
// annotation merged into another or went unannounced, for ANClearUserData to free.
// Out of memory the block is not kept: never freed rather than freed too soon.
void ANKeepOrphanBlock(ANInstance *instance, uint64_t block);

// Frees the kept blocks, each once, except those an entry owns (freed with the
// entries' blocks), and forgets them.
void ANFreeOrphanBlocks(ANInstance *instance);

// A new table block of ANTABLE_GROWTH slots, all on the free list in increasing
// order, no entries, `full` and `hasText` 0. Null when out of memory.
ANEntryTable *ANMakeTable();

// Grows the table by ANTABLE_GROWTH slots; the new slots join the tail of the free
// list in increasing order. Returns 13 and sets `full` when the capacity would pass
// ANTABLE_MAX_CAPACITY; 13 when out of memory (the table stays valid and
// unchanged). *table may move.
uint32_t ANGrowTable(ANEntryTable **table);

// Takes the slot at the front of the free list out of it and returns it, or AN_NONE
// when the free list is empty. The slot is in neither list afterwards; the caller
// fills it and links it in with ANListInsertAfter (adding 1 to `count`).
uint16_t ANTakeSlot(ANEntryTable *table);

// Gives back a slot that is already out of the ordered list (ANListRemove): puts it
// at the front of the free list, subtracts 1 from `count` and clears `full`. The
// instance's hover state is the caller's to reset.
void ANReleaseSlot(ANEntryTable *table, uint16_t slot);

// Links `slot` into the ordered list right after `after` (AN_NONE: at the front).
// `count` is not changed.
void ANListInsertAfter(ANEntryTable *table, uint16_t slot, uint16_t after);

// Unlinks `slot` from the ordered list, joining its neighbours and updating
// `first`/`last`; its own links are left as they were. `count` is not changed.
void ANListRemove(ANEntryTable *table, uint16_t slot);

// Whether an entry whose start is `start` lies past the anchor of `anchor`, so that
// a walk over the entries at or before that anchor can stop. Anchors compare in
// document order (a subItemId of ANPOS_NOSUBITEM counts as 0), so entries on the
// item itself, which come before its characters, never end such a walk early.
inline bool ANStartPastAnchor(const ANPos &start, const ANPos &anchor) {
    if (start.itemId != anchor.itemId) return start.itemId > anchor.itemId;
    const uint32_t s = start.subItemId == ANPOS_NOSUBITEM ? 0 : start.subItemId;
    const uint32_t a = anchor.subItemId == ANPOS_NOSUBITEM ? 0 : anchor.subItemId;
    return s > a;
}

// Restores document order of `start` in the ordered list with one stable insertion
// pass over the entries up to `anchor` (an entry that sorts before the one listed
// ahead of it moves back to just after the nearest earlier entry that sorts at or
// before it). Entries in order never move, so ties keep their order. The pass begins
// behind `from` when the caller knows that entry and all before it are in order and
// sort before every entry that may have moved (AN_NONE: at the head).
void ANRestoreOrder(ANEntryTable *table, const ANPos &anchor, uint16_t from = AN_NONE);

#endif  // ANNO_STORE_STORE_H
