// The step along the ordered list of an annotation table that tracking, events and
// range cutting share.
#ifndef ANNO_TRACKING_LIST_STEP_H
#define ANNO_TRACKING_LIST_STEP_H

#include <cstdint>

#include "anno/anno.h"
#include "positions/order.h"
#include "store/table.h"

// The first entry after `after` (from the head of the list when `after` is AN_NONE)
// that is not wholly before `pos`: its start sorts after `pos` or its end at or after
// it. AN_NONE when the list ends first. The entries passed over all end before `pos`.
inline uint16_t ANNextEntryNotBefore(const ANEntryTable *table, uint16_t after, const ANPos &pos) {
    uint16_t index = after == AN_NONE ? table->first : ANSlot(table, after).next;
    while (index != AN_NONE) {
        const ANAnnoRecord &record = ANSlot(table, index).record;
        if (ANComparePos(record.start, pos) > 0 || ANComparePos(record.end, pos) >= 0) break;
        index = ANSlot(table, index).next;
    }
    return index;
}

#endif  // ANNO_TRACKING_LIST_STEP_H
