// Reading annotation text unit by unit through the per-anchor cache of a text track.
#include "anno/anno.h"
#include "binding/instance.h"
#include "positions/order.h"
#include "queries/queries.h"
#include "store/table.h"
#include "tracking/text_track.h"

namespace {

bool ANIsTextEntry(const ANEntry &entry) {
    return entry.type == AN_TYPE_TEXT || entry.type == AN_TYPE_PLACEHOLDER;
}

// Whether the cache answers for `pos`. The anchor must match plainly as well: the
// order lets text at (i, 0xFFFFFFFF) and at (i, 0) sort as one, but each is its own
// text, and the answer must not depend on which of them was cached first.
bool ANInCachedRange(const ANAnnoTextTrack &track, const ANPos &pos) {
    return ANSameAnchor(pos, track.firstPos) && ANPosAtOrBefore(track.firstPos, pos) &&
           ANPosAtOrBefore(pos, track.lastPos);
}

// Caches the whole annotation text of the anchor of `pos`: one segment per type-5 or
// type-6 entry anchored there, in list order. 13 when out of memory; the segments
// gathered before stay cached with the range covering them.
uint32_t ANRebuildTextCache(const ANInstance *instance, ANAnnoTextTrack *track, const ANPos &pos) {
    track->firstPos = ANPos{};
    track->lastPos = ANPos{};
    ANReleaseTextSegs(track->segs);

    const ANEntryTable *table = instance->entries;
    if (table == nullptr) return AN_OK;
    uint16_t i = table->first;
    while (i != AN_NONE && !ANSameAnchor(ANSlot(table, i).record.start, pos)) {
        i = ANSlot(table, i).next;
    }
    bool first = true;
    for (; i != AN_NONE && ANSameAnchor(ANSlot(table, i).record.start, pos);
         i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        if (!ANIsTextEntry(entry)) continue;
        const bool text = entry.type == AN_TYPE_TEXT;
        const uint32_t rc =
            ANAppendTextSeg(&track->segs, text ? ANTEXTSEG_TEXT : ANTEXTSEG_UNIT,
                            entry.record.textBuffer, text ? entry.record.textLength : 1);
        if (rc != AN_OK) return rc;
        const uint32_t length = ANTextSegs(track->segs)[track->segs->segTail].segLength;
        if (first) {
            track->firstPos = ANPos{pos.itemId, pos.subItemId, ANPOS_ANNOTEXT, 0};
            track->lastPos = ANPos{pos.itemId, pos.subItemId, ANPOS_ANNOTEXT, length - 1};
            first = false;
        } else {
            track->lastPos.textIndex += length;
        }
    }
    return AN_OK;
}

}  // namespace

extern "C" AN_API uint32_t ANGetAnnoText(DAHandle doc, ANAnnoTextTrack *track, const ANPos *pos,
                                         uint16_t *unit) {
    if (doc == nullptr) return AN_ERR_BADARG;
    // A track that was never started, or was ended, has no list to read or fill.
    if (track == nullptr || track->segs == nullptr || pos == nullptr || unit == nullptr) {
        return AN_ERR_BADARG;
    }
    if (!ANInCachedRange(*track, *pos)) {
        ANInstance *instance = nullptr;
        const uint32_t rc = ANFindState(doc, &instance);
        if (rc != AN_OK) return rc;
        const uint32_t built = ANRebuildTextCache(instance, track, *pos);
        if (built != AN_OK) return built;
        if (!ANInCachedRange(*track, *pos)) return AN_ERR_NOTFOUND;
    }

    const ANTextSeg *slots = ANTextSegs(track->segs);
    uint32_t total = 0;
    for (uint16_t i = track->segs->segHead; i != AN_NONE; i = slots[i].next) {
        const ANTextSeg &seg = slots[i];
        total += seg.segLength;
        if (total <= pos->textIndex) continue;
        if (seg.segKind == ANTEXTSEG_UNIT) {
            *unit = 0;
            return ANTEXT_PLACEHOLDER_FOUND;
        }
        *unit = seg.segText[pos->textIndex - (total - seg.segLength)];
        return ANTEXT_UNIT_FOUND;
    }
    return AN_ERR_NOTFOUND;
}
