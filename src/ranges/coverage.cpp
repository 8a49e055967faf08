// Whether a position already lies in a range annotation, or on a cut marker.
#include "positions/order.h"
#include "ranges/split.h"
#include "store/index.h"
#include "store/table.h"

namespace {

// The ordered list is in start order, so the walk ends at the first entry that
// starts after `pos`; only the types asked for count.
uint32_t ANPosCovered(const ANInstance *instance, const ANPos &pos, bool marks) {
    if (instance == nullptr || instance->entries == nullptr) return 0;
    const ANEntryTable *table = instance->entries;
    if (const ANEntryIndex *index = ANCurrentIndex(instance)) {
        // The walk would meet exactly the entries that start at or before `pos`; of
        // those of the types asked for, the one that ends last decides.
        const uint32_t met = ANIndexRanksAtOrBefore(table, index, pos);
        if (met == 0) return 0;
        const ANIndexArrays arrays = ANIndexArraysOf(index);
        const uint16_t farthest = marks ? arrays.farCover[met - 1] : arrays.farRange[met - 1];
        return farthest != AN_NONE && ANPosBefore(pos, ANSlot(table, farthest).record.end) ? 1 : 0;
    }
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        if (ANPosBefore(pos, entry.record.start)) return 0;
        if (!ANPosBefore(pos, entry.record.end)) continue;
        if (entry.type == AN_TYPE_RANGE || (marks && entry.type == AN_TYPE_CUTMARK)) return 1;
    }
    return 0;
}

}  // namespace

uint32_t ANPosInRangeOrMark(const ANInstance *instance, const ANPos *pos) {
    return pos == nullptr ? 0 : ANPosCovered(instance, *pos, true);
}

uint32_t ANPosInRange(const ANInstance *instance, const ANPos *pos) {
    return pos == nullptr ? 0 : ANPosCovered(instance, *pos, false);
}
