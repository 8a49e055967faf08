// Display tracking: the caller's tracking record is started at a position and then
// told, position by position in ascending order, what the annotations covering each
// position are. Between change points a call costs one comparison; at a change point
// it walks on from its cursor in the ordered list, never from the head.
#include "anno/anno.h"
#include "binding/instance.h"
#include "positions/order.h"
#include "store/index.h"
#include "store/table.h"
#include "styles/resolve.h"
#include "tracking/list_step.h"

namespace {

constexpr uint32_t ANTRACK_PAST_END = 0xFFFFFFFF;

// Marks the walk as past the last annotation; kind and textIndex are kept.
void ANSetPastEnd(ANPos &nextChange) {
    nextChange.itemId = ANTRACK_PAST_END;
    nextChange.subItemId = ANTRACK_PAST_END;
}

void ANClearStyleFlags(ANTrackInfo *track) {
    track->color1Set = 0;
    track->color2Set = 0;
    track->attrSet = 0;
}

// The nearest start or end after `pos` among `cursor` and the entries after it, or
// `pos` itself when the cursor ends there. Entries before the cursor end at or before
// `pos` and cannot contribute; starts are in list order, so the scan stops at the
// first start past the candidate.
void ANComputeNextChange(const ANEntryTable *table, uint16_t cursor, const ANPos &pos,
                         ANTrackInfo *track) {
    if (cursor == AN_NONE) {
        ANSetPastEnd(track->nextChange);
        return;
    }
    const ANAnnoRecord &first = ANSlot(table, cursor).record;
    if (ANComparePos(first.start, pos) > 0) {
        track->nextChange = first.start;
        return;
    }
    ANPos next = first.end;
    for (uint16_t f = ANSlot(table, cursor).next; f != AN_NONE; f = ANSlot(table, f).next) {
        const ANAnnoRecord &record = ANSlot(table, f).record;
        if (ANComparePos(record.start, next) > 0) break;
        if (ANComparePos(record.start, pos) > 0) {
            next = record.start;
        } else if (ANComparePos(record.end, pos) > 0 && ANComparePos(record.end, next) <= 0) {
            next = record.end;
        }
    }
    track->nextChange = next;
}

// Whether the covering highlight `entry` stays out of the way of `current`, the one
// in force: it runs on further from a lower slot, or has exactly the same extent.
// Otherwise (nested in `current`, or running on further from a higher slot) it wins.
bool ANHighlightYields(const ANEntryTable *table, uint16_t entry, uint16_t current) {
    const ANAnnoRecord &e = ANSlot(table, entry).record;
    const ANAnnoRecord &h = ANSlot(table, current).record;
    const int16_t ends = ANComparePos(e.end, h.end);
    if (ends > 0 && entry < current) return true;
    return ends == 0 && ANComparePos(e.start, h.start) == 0;
}

// Reports one entry that covers the tracked position.
uint32_t ANReportEntry(DAHandle doc, const ANEntryTable *table, uint16_t index,
                       ANTrackInfo *track) {
    const ANEntry &entry = ANSlot(table, index);
    switch (entry.type) {
        case AN_TYPE_HILITE:
            if (track->hiliteEntry != AN_NONE) {
                if (ANHighlightYields(table, index, track->hiliteEntry)) return 0;
                ANClearStyleFlags(track);
            }
            track->hiliteEntry = index;
            return ANResolveStyle(doc, table, track, index);
        case AN_TYPE_POINT:
            track->value = entry.record.value;
            return ANTRACK_BIT_POINT;
        case AN_TYPE_RANGE:
            track->rangeActive = 1;
            track->userData = entry.record.userData;
            return ANTRACK_BIT_RANGE;
        case AN_TYPE_VALUE:
            track->value = entry.record.value;
            return ANTRACK_BIT_VALUE;
        case AN_TYPE_TEXT:
            track->userData = entry.record.userData;
            track->textBuffer = entry.record.textBuffer;
            track->textLength = entry.record.textLength;
            return ANTRACK_BIT_TEXT;
        case AN_TYPE_CUTMARK:
            track->markActive = 1;
            return ANTRACK_BIT_CUTMARK;
        default:  // placeholders are never reported
            return 0;
    }
}

}  // namespace

extern "C" AN_API uint32_t ANStartAnnoTrack(DAHandle doc, const ANPos *start, ANTrackInfo *track) {
    ANInstance *instance = nullptr;
    if (start == nullptr || track == nullptr) return ANTRACK_NONE;
    if (ANFindState(doc, &instance) != AN_OK) return ANTRACK_NONE;

    // markActive is the caller's to keep: a marker reported just before a restart is
    // reported once more by the first full call.
    track->rangeActive = 0;
    ANClearStyleFlags(track);

    const ANEntryTable *table = instance->entries;
    if (table == nullptr || table->count == 0) return ANTRACK_NONE;

    track->cursor = AN_NONE;
    track->hiliteEntry = AN_NONE;
    // Through the index of a large table rather than from the head of the list.
    const uint16_t first = ANFirstEntryNotBefore(instance, *start);
    if (first == AN_NONE) {
        ANSetPastEnd(track->nextChange);
        return ANTRACK_NOMORE;
    }
    track->cursor = first;
    const ANPos &firstStart = ANSlot(table, first).record.start;
    track->nextChange = ANComparePos(firstStart, *start) < 0 ? *start : firstStart;
    return ANTRACK_ACTIVE;
}

extern "C" AN_API uint32_t ANEndAnnoTrack(DAHandle, ANTrackInfo *) { return 0; }

extern "C" AN_API uint32_t ANTrackAnno(DAHandle doc, const ANPos *pos, ANTrackInfo *track) {
    if (doc == nullptr || pos == nullptr || track == nullptr) return 0;
    // Only whether a state came back counts, not what the lookup reported.
    void *state = nullptr;
    DAGetAnno(doc, &state);
    if (state == nullptr) return 0;

    const ANPos p = *pos;
    if (ANComparePos(p, track->nextChange) < 0) return 0;
    const ANEntryTable *table = static_cast<const ANInstance *>(state)->entries;
    if (table == nullptr) return 0;

    uint32_t result = 0;
    uint16_t from = track->cursor;
    // A record kept across a change of the annotations may name a slot the table no
    // longer has; it then counts as having no cursor rather than being read.
    if (from != AN_NONE && from >= table->capacity) from = AN_NONE;

    // What covered the previous full call's position is reported once more.
    if (track->rangeActive != 0) {
        result |= ANTRACK_BIT_RANGE;
        if (from != AN_NONE) track->userData = ANSlot(table, from).record.userData;
        track->rangeActive = 0;
    }
    if (track->markActive != 0) {
        track->markActive = 0;
        result |= ANTRACK_BIT_CUTMARK;
    }
    if (track->hiliteEntry != AN_NONE) {
        ANClearStyleFlags(track);
        result |= ANTRACK_BIT_HILITE;
    }

    uint16_t cursor = from;
    if (from == AN_NONE || ANComparePos(ANSlot(table, from).record.end, p) <= 0) {
        cursor = ANNextEntryNotBefore(table, from, p);
    }
    track->cursor = cursor;
    ANComputeNextChange(table, cursor, p, track);
    track->hiliteEntry = AN_NONE;
    if (from == AN_NONE) return result;

    // Every entry passed between `from` and the new cursor ends before p, so this walk
    // meets exactly the entries covering p, in list order.
    for (uint16_t e = from; e != AN_NONE; e = ANNextEntryNotBefore(table, e, p)) {
        const ANAnnoRecord &record = ANSlot(table, e).record;
        if (ANComparePos(record.start, p) > 0) break;
        if (ANComparePos(record.end, p) > 0) result |= ANReportEntry(doc, table, e, track);
    }
    return result;
}
