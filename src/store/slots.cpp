// Making and growing the annotation table, taking and giving back slots, moving
// entries within the ordered list, and the caller blocks no entry holds any more.
#include "hosts/heap.h"
#include "store/store.h"

namespace {

constexpr uint32_t kOrphanGrowth = 8;  // kept blocks, in records of 8 bytes

// Links slots [from, to) into a free-list chain in increasing order, hanging it
// after `tail` (AN_NONE: the chain is the whole free list).
void ANChainFreeSlots(ANEntryTable *table, uint16_t from, uint16_t to) {
    const uint16_t tail = table->freeLast;
    for (uint32_t i = from; i < to; ++i) {
        ANEntry &slot = ANSlot(table, static_cast<uint16_t>(i));
        slot.prev = i == from ? tail : static_cast<uint16_t>(i - 1);
        slot.next = i + 1 == to ? AN_NONE : static_cast<uint16_t>(i + 1);
        slot.type = 0;
        slot.flags = 0;
    }
    if (tail == AN_NONE) {
        table->freeFirst = from;
    } else {
        ANSlot(table, tail).next = from;
    }
    table->freeLast = static_cast<uint16_t>(to - 1);
}

}  // namespace

ANEntryTable *ANMakeTable() {
    auto *table = static_cast<ANEntryTable *>(ANHeapAlloc(ANTableBytes(ANTABLE_GROWTH), true));
    if (table == nullptr) return nullptr;
    table->count = 0;
    table->capacity = ANTABLE_GROWTH;
    table->first = AN_NONE;
    table->last = AN_NONE;
    table->freeFirst = AN_NONE;
    table->freeLast = AN_NONE;
    table->full = 0;
    table->hasText = 0;
    ANChainFreeSlots(table, 0, ANTABLE_GROWTH);
    return table;
}

uint32_t ANGrowTable(ANEntryTable **table) {
    ANEntryTable *old = *table;
    const uint32_t grown = static_cast<uint32_t>(old->capacity) + ANTABLE_GROWTH;
    if (grown > ANTABLE_MAX_CAPACITY) {
        old->full = 1;
        return AN_ERR_NOMEM;
    }
    const auto capacity = static_cast<uint16_t>(grown);
    auto *table2 = static_cast<ANEntryTable *>(ANHeapReAlloc(old, ANTableBytes(capacity)));
    if (table2 == nullptr) return AN_ERR_NOMEM;
    const uint16_t oldCapacity = table2->capacity;
    table2->capacity = capacity;
    ANChainFreeSlots(table2, oldCapacity, capacity);
    *table = table2;
    return AN_OK;
}

uint16_t ANTakeSlot(ANEntryTable *table) {
    const uint16_t slot = table->freeFirst;
    if (slot == AN_NONE) return AN_NONE;
    const uint16_t following = ANSlot(table, slot).next;
    table->freeFirst = following;
    if (following == AN_NONE) {
        table->freeLast = AN_NONE;
    } else {
        ANSlot(table, following).prev = AN_NONE;
    }
    ANEntry &entry = ANSlot(table, slot);
    entry.next = AN_NONE;
    entry.prev = AN_NONE;
    return slot;
}

void ANReleaseSlot(ANEntryTable *table, uint16_t slot) {
    ANEntry &entry = ANSlot(table, slot);
    entry.prev = AN_NONE;
    entry.next = table->freeFirst;
    if (table->freeFirst == AN_NONE) {
        table->freeLast = slot;
    } else {
        ANSlot(table, table->freeFirst).prev = slot;
    }
    table->freeFirst = slot;
    table->count--;
    table->full = 0;
}

void ANListInsertAfter(ANEntryTable *table, uint16_t slot, uint16_t after) {
    ANEntry &entry = ANSlot(table, slot);
    const uint16_t before = after == AN_NONE ? table->first : ANSlot(table, after).next;
    entry.prev = after;
    entry.next = before;
    if (after == AN_NONE) {
        table->first = slot;
    } else {
        ANSlot(table, after).next = slot;
    }
    if (before == AN_NONE) {
        table->last = slot;
    } else {
        ANSlot(table, before).prev = slot;
    }
}

void ANListRemove(ANEntryTable *table, uint16_t slot) {
    const ANEntry &entry = ANSlot(table, slot);
    if (entry.prev == AN_NONE) {
        table->first = entry.next;
    } else {
        ANSlot(table, entry.prev).next = entry.next;
    }
    if (entry.next == AN_NONE) {
        table->last = entry.prev;
    } else {
        ANSlot(table, entry.next).prev = entry.prev;
    }
}

void ANRestoreOrder(ANEntryTable *table, const ANPos &anchor, uint16_t from) {
    if (table == nullptr || table->first == AN_NONE) return;
    uint16_t current = ANSlot(table, from == AN_NONE ? table->first : from).next;
    while (current != AN_NONE) {
        const ANEntry &entry = ANSlot(table, current);
        if (ANStartPastAnchor(entry.record.start, anchor)) break;
        const uint16_t following = entry.next;
        const ANPos &start = entry.record.start;
        if (ANPosBefore(start, ANSlot(table, entry.prev).record.start)) {
            uint16_t after = ANSlot(table, entry.prev).prev;
            while (after != AN_NONE && ANPosBefore(start, ANSlot(table, after).record.start)) {
                after = ANSlot(table, after).prev;
            }
            ANListRemove(table, current);
            ANListInsertAfter(table, current, after);
        }
        current = following;
    }
}

void ANKeepOrphanBlock(ANInstance *instance, uint64_t block) {
    if (block == 0) return;
    if (instance->orphanCount == instance->orphanCapacity) {
        const uint32_t capacity = instance->orphanCapacity + kOrphanGrowth;
        const size_t bytes = sizeof(uint64_t) * capacity;
        void *grown = instance->orphans == nullptr ? ANHeapAlloc(bytes)
                                                   : ANHeapReAlloc(instance->orphans, bytes);
        if (grown == nullptr) return;
        instance->orphans = static_cast<uint64_t *>(grown);
        instance->orphanCapacity = capacity;
    }
    instance->orphans[instance->orphanCount++] = block;
}

void ANFreeOrphanBlocks(ANInstance *instance) {
    const ANEntryTable *table = instance->entries;
    for (uint32_t k = 0; k < instance->orphanCount; ++k) {
        const uint64_t block = instance->orphans[k];
        bool held = false;
        for (uint32_t j = 0; j < k && !held; ++j) held = instance->orphans[j] == block;
        for (uint16_t i = table != nullptr ? table->first : AN_NONE; i != AN_NONE && !held;
             i = ANSlot(table, i).next) {
            const ANEntry &entry = ANSlot(table, i);
            held = (entry.flags & ANENTRY_OWNS_USERDATA) != 0 && entry.record.userData == block;
        }
        // NOLINTNEXTLINE(performance-no-int-to-ptr): userData holds the block
        if (!held) ANHeapFree(reinterpret_cast<void *>(static_cast<uintptr_t>(block)));
    }
    instance->orphanCount = 0;
}
