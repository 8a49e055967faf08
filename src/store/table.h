// The annotation table of a document: fixed-size slots in one heap block, linked by
// 16-bit slot indices into the ordered list (document order of start) and the free
// list.
#ifndef ANNO_STORE_TABLE_H
#define ANNO_STORE_TABLE_H

#include <cstddef>
#include <cstdint>

#include "anno/anno.h"

constexpr uint16_t ANTABLE_GROWTH = 10;
constexpr uint16_t ANTABLE_MAX_CAPACITY = 65530;

// Entry flags (library bookkeeping beside the record).
constexpr uint16_t ANENTRY_OWNS_USERDATA = 0x1;  // userData is a heap block the caller gave

struct ANEntry {
    uint16_t next;  // ordered list, or free list
    uint16_t prev;
    uint16_t type;   // 1..7; meaningless in a free slot
    uint16_t flags;  // ANENTRY_*
    ANAnnoRecord record;
};
static_assert(sizeof(ANEntry) == 104, "ANEntry is 104 bytes");
static_assert(offsetof(ANEntry, record) == 8, "ANEntry.record");

struct ANEntryTable {
    uint16_t count;
    uint16_t capacity;
    uint16_t first;
    uint16_t last;
    uint16_t freeFirst;
    uint16_t freeLast;
    uint32_t full;     // 1 once the capacity could not grow within 16 bits
    uint32_t hasText;  // 1 once a type-5 or type-6 entry was inserted
    uint32_t reserved;
    // followed by `capacity` ANEntry slots
};
static_assert(sizeof(ANEntryTable) == 24, "ANEntryTable header is 24 bytes");
static_assert(sizeof(ANEntryTable) % alignof(ANEntry) == 0, "slots follow the header aligned");

// The slot array that follows the header.
inline ANEntry *ANSlots(ANEntryTable *table) { return reinterpret_cast<ANEntry *>(table + 1); }
inline const ANEntry *ANSlots(const ANEntryTable *table) {
    return reinterpret_cast<const ANEntry *>(table + 1);
}
inline ANEntry &ANSlot(ANEntryTable *table, uint16_t index) { return ANSlots(table)[index]; }
inline const ANEntry &ANSlot(const ANEntryTable *table, uint16_t index) {
    return ANSlots(table)[index];
}

// Bytes of a table block with `capacity` slots.
inline size_t ANTableBytes(uint16_t capacity) {
    return sizeof(ANEntryTable) + sizeof(ANEntry) * capacity;
}

// Frees a table block with the text buffers of its type-5 entries.
void ANFreeTable(ANEntryTable *table);

#endif  // ANNO_STORE_TABLE_H
