// Builds a document's annotation table by hand, with every entry in a slot of the
// test's choosing, for tests that need exact slot numbers or list orders without
// going through adding. The table is the state's own afterwards: ANDeInit frees it.
#ifndef ANNO_TESTS_TRACKING_HAND_TABLE_H
#define ANNO_TESTS_TRACKING_HAND_TABLE_H

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <string_view>
#include <vector>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "hosts/heap.h"
#include "store/table.h"

namespace tracktest {

struct HandEntry {
    uint16_t slot;
    uint16_t type;
    ANAnnoRecord record;
};

inline ANAnnoRecord Rec(const ANPos &start, const ANPos &end, uint64_t userData = 0,
                        uint64_t value = 0, uint32_t style = 0) {
    ANAnnoRecord record{};
    record.size = AN_RECORD_SIZE_POINT;
    record.start = start;
    record.end = end;
    record.userData = userData;
    record.value = value;
    record.style = style;
    return record;
}

// A type-5 record holding `text` in a heap buffer, as a stored text entry has it.
inline ANAnnoRecord TextRec(const ANPos &start, const ANPos &end, std::u16string_view text,
                            uint64_t userData = 0) {
    ANAnnoRecord record = Rec(start, end, userData);
    record.size = AN_RECORD_SIZE_TEXT;
    record.textLength = static_cast<uint32_t>(text.size());
    record.textCapacity = 64;
    record.textBuffer = static_cast<uint16_t *>(ANHeapAlloc(64 * sizeof(uint16_t)));
    std::memcpy(record.textBuffer, text.data(), text.size() * sizeof(uint16_t));
    return record;
}

// Makes `entries`, in list order, the annotation table of `doc` (which has a state
// and no table yet). The slots no entry names form the free list in ascending order.
inline void InstallTable(DAHandle doc, const std::vector<HandEntry> &entries) {
    auto *state = static_cast<ANInstance *>(antk::annoSlot(doc));
    ASSERT_NE(state, nullptr);
    ASSERT_EQ(state->entries, nullptr);
    uint32_t highest = 0;
    for (const HandEntry &e : entries) highest = std::max<uint32_t>(highest, e.slot);
    const uint16_t capacity = static_cast<uint16_t>((highest + 2 + 9) / 10 * 10);
    auto *table = static_cast<ANEntryTable *>(ANHeapAlloc(ANTableBytes(capacity), true));
    ASSERT_NE(table, nullptr);
    table->capacity = capacity;
    table->count = static_cast<uint16_t>(entries.size());
    table->first = table->last = AN_NONE;
    std::vector<bool> used(capacity, false);
    uint16_t prev = AN_NONE;
    for (const HandEntry &e : entries) {
        ASSERT_FALSE(used[e.slot]) << "slot " << e.slot << " named twice";
        used[e.slot] = true;
        ANEntry &slot = ANSlot(table, e.slot);
        slot.type = e.type;
        slot.record = e.record;
        slot.prev = prev;
        slot.next = AN_NONE;
        if (prev == AN_NONE) {
            table->first = e.slot;
        } else {
            ANSlot(table, prev).next = e.slot;
        }
        prev = e.slot;
        if (e.type == AN_TYPE_TEXT || e.type == AN_TYPE_PLACEHOLDER) table->hasText = 1;
    }
    table->last = prev;
    table->freeFirst = table->freeLast = AN_NONE;
    for (uint16_t i = 0; i < capacity; ++i) {
        if (used[i]) continue;
        ANSlot(table, i).prev = table->freeLast;
        ANSlot(table, i).next = AN_NONE;
        if (table->freeLast == AN_NONE) {
            table->freeFirst = i;
        } else {
            ANSlot(table, table->freeLast).next = i;
        }
        table->freeLast = i;
    }
    state->entries = table;
}

}  // namespace tracktest

#endif  // ANNO_TESTS_TRACKING_HAND_TABLE_H
