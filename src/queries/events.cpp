// Delivering input events at a position to the annotations there: click-like events
// to every annotation under it, moves as leave and enter events against the last move.
#include "anno/anno.h"
#include "binding/instance.h"
#include "positions/order.h"
#include "store/table.h"
#include "tracking/list_step.h"

namespace {

bool ANContains(const ANEntry &entry, const ANPos &pos) {
    return ANPosAtOrBefore(entry.record.start, pos) && ANPosBefore(pos, entry.record.end);
}

// Whether `index` names an entry of the ordered list. Slot indices come from the
// caller and from the last move; one beyond the table or on the free list would
// make the walk read outside the table or follow free-list links.
bool ANIsLiveEntry(const ANEntryTable *table, uint16_t index) {
    if (index >= table->capacity) return false;
    uint32_t steps = 0;
    for (uint16_t i = table->first; i != AN_NONE && steps <= table->count;
         i = ANSlot(table, i).next, ++steps) {
        if (i == index) return true;
    }
    return false;
}

// What one ANAnnoEvent call shares between its passes: the record handed to the
// callback, zeroed once and overwritten for each delivery, and the last result.
struct ANEventWalk {
    const ANInstance *instance;
    const ANEntryTable *table;
    ANEventRec record;
    uint32_t result;
};

void ANDeliver(ANEventWalk &walk, const ANEntry &entry, uint32_t code) {
    walk.record.size = ANEVENTREC_SIZE;
    walk.record.event = code;
    walk.record.tag = entry.record.tag;
    walk.record.userData = entry.record.userData;
    const uint16_t wanted = (entry.record.eventMask & code) != 0 ? 1 : 0;
    walk.result = ANNotify(walk.instance, ANNOTIFY_EVENT, wanted, &walk.record);
}

bool ANIsClickLike(uint32_t event) {
    return event == ANEVENT_CLICK1 || event == ANEVENT_CLICK2 || event == ANEVENT_CLICK3;
}

void ANDeliverClick(ANEventWalk &walk, uint32_t event, uint16_t from, const ANPos &pos) {
    for (uint16_t i = from; i != AN_NONE; i = ANNextEntryNotBefore(walk.table, i, pos)) {
        const ANEntry &entry = ANSlot(walk.table, i);
        if (ANPosBefore(pos, entry.record.start)) break;
        if (ANContains(entry, pos)) ANDeliver(walk, entry, event);
    }
}

// Delivers `event` to the entries from `from` on that contain `at` but not `other`.
void ANDeliverCrossing(ANEventWalk &walk, uint32_t event, uint16_t from, const ANPos &at,
                       const ANPos &other) {
    for (uint16_t i = from; i != AN_NONE; i = ANNextEntryNotBefore(walk.table, i, at)) {
        const ANEntry &entry = ANSlot(walk.table, i);
        if (ANPosBefore(at, entry.record.start)) break;
        if (ANContains(entry, at) && !ANContains(entry, other)) ANDeliver(walk, entry, event);
    }
}

}  // namespace

extern "C" AN_API uint32_t ANAnnoEvent(DAHandle doc, uint32_t event, uint16_t entry,
                                       const ANPos *pos) {
    ANInstance *instance = nullptr;
    if (pos == nullptr || ANFindState(doc, &instance) != AN_OK) return 0;
    const ANEntryTable *table = instance->entries;
    if (table == nullptr) return 0;
    if (entry != AN_NONE && !ANIsLiveEntry(table, entry)) return 0;

    ANEventWalk walk{instance, table, ANEventRec{}, 0};
    const ANPos p = *pos;
    if (ANIsClickLike(event)) {
        ANDeliverClick(walk, event, entry, p);
        return walk.result;
    }
    if (event != ANEVENT_MOVE) return 0;

    if (entry == AN_NONE && instance->hoverEntry == AN_NONE) return 0;
    const ANPos last = instance->hoverPos;
    const uint16_t hover = instance->hoverEntry;
    // Every leave comes before any enter.
    if (hover != AN_NONE && ANIsLiveEntry(table, hover)) {
        ANDeliverCrossing(walk, ANEVENT_LEAVE, hover, last, p);
    }
    if (entry != AN_NONE) ANDeliverCrossing(walk, ANEVENT_ENTER, entry, p, last);
    instance->hoverEntry = entry;
    instance->hoverPos = p;
    return walk.result;
}
