// Position order, inline for the library's hot paths (tracking, insertion, walks).
#ifndef ANNO_POSITIONS_ORDER_H
#define ANNO_POSITIONS_ORDER_H

#include <cstdint>

#include "anno/anno.h"

// -1, 0 or 1 as `a` sorts before, equal to or after `b`. Positions sort by
// (itemId; subItemId with 0xFFFFFFFF counted as 0; annotation text before content;
// for text the textIndex, for content the item itself before its first character).
inline int16_t ANComparePos(const ANPos &a, const ANPos &b) {
    if (a.itemId != b.itemId) return a.itemId < b.itemId ? -1 : 1;
    const uint32_t sa = a.subItemId == ANPOS_NOSUBITEM ? 0 : a.subItemId;
    const uint32_t sb = b.subItemId == ANPOS_NOSUBITEM ? 0 : b.subItemId;
    if (sa != sb) {
        if (a.subItemId == ANPOS_NOSUBITEM) return -1;
        if (b.subItemId == ANPOS_NOSUBITEM) return 1;
        return a.subItemId < b.subItemId ? -1 : 1;
    }
    const bool ta = a.kind == ANPOS_ANNOTEXT;
    const bool tb = b.kind == ANPOS_ANNOTEXT;
    if (ta != tb) return ta ? -1 : 1;
    if (ta) {
        if (a.textIndex == b.textIndex) return 0;
        return a.textIndex < b.textIndex ? -1 : 1;
    }
    if (a.subItemId == b.subItemId) return 0;
    return a.subItemId == ANPOS_NOSUBITEM ? -1 : 1;
}

inline bool ANPosBefore(const ANPos &a, const ANPos &b) { return ANComparePos(a, b) < 0; }
inline bool ANPosEqual(const ANPos &a, const ANPos &b) { return ANComparePos(a, b) == 0; }
inline bool ANPosAtOrBefore(const ANPos &a, const ANPos &b) { return ANComparePos(a, b) <= 0; }

// Plain equality of the anchors (itemId, subItemId) of two positions.
inline bool ANSameAnchor(const ANPos &a, const ANPos &b) {
    return a.itemId == b.itemId && a.subItemId == b.subItemId;
}

// The position one step after `pos` as point annotations use it: the next text index
// inside annotation text, otherwise the next subItemId (0xFFFFFFFF wraps to 0). The
// greatest text index has no next one (no anchor's text reaches it): it is its own
// step, where a wrap to index 0 would put the step before the position.
inline ANPos ANStepAfter(const ANPos &pos) {
    ANPos next = pos;
    if (pos.kind == ANPOS_ANNOTEXT) {
        if (next.textIndex != UINT32_MAX) next.textIndex++;
    } else {
        next.subItemId++;
    }
    return next;
}

#endif  // ANNO_POSITIONS_ORDER_H
