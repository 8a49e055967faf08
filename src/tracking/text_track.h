// The segment list of an annotation text track: the cached annotation text of one
// anchor, one segment per type-5 or type-6 entry in list order. One heap block, a
// header followed by the slots, linked by 16-bit slot indices into the used list
// and the free list.
#ifndef ANNO_TRACKING_TEXT_TRACK_H
#define ANNO_TRACKING_TEXT_TRACK_H

#include <cstddef>
#include <cstdint>

#include "anno/anno.h"

constexpr uint16_t ANTEXTSEG_GROWTH = 5;  // slots at the start and per growth
constexpr uint16_t ANTEXTSEG_TEXT = 5;    // segKind: the text of a type-5 entry
constexpr uint16_t ANTEXTSEG_UNIT = 6;    // segKind: the one unit of a type-6 entry

struct ANTextSeg {
    uint16_t segKind;    // ANTEXTSEG_TEXT or ANTEXTSEG_UNIT
    uint32_t segLength;  // units: the entry's textLength, or 1
    uint16_t *segText;   // kind 5: the slot's own copy (null when empty); kind 6: null
    uint16_t next;       // used list, or free list
    uint16_t prev;       // used list only
};
static_assert(sizeof(ANTextSeg) == 24, "ANTextSeg is 24 bytes");
static_assert(offsetof(ANTextSeg, segLength) == 4, "ANTextSeg.segLength");
static_assert(offsetof(ANTextSeg, segText) == 8, "ANTextSeg.segText");
static_assert(offsetof(ANTextSeg, next) == 16, "ANTextSeg.next");
static_assert(offsetof(ANTextSeg, prev) == 18, "ANTextSeg.prev");

struct ANTextSegList {
    uint16_t segHead;  // first used slot, AN_NONE when nothing is cached
    uint16_t segTail;  // last used slot, AN_NONE when nothing is cached
    uint16_t segFree;  // first free slot
    uint16_t segCount;
    uint16_t segCapacity;
    uint16_t reserved[3];
    // followed by `segCapacity` ANTextSeg slots
};
static_assert(sizeof(ANTextSegList) == 16, "ANTextSegList header is 16 bytes");
static_assert(offsetof(ANTextSegList, segCapacity) == 8, "ANTextSegList.segCapacity");
static_assert(sizeof(ANTextSegList) % alignof(ANTextSeg) == 0, "slots follow the header aligned");

inline ANTextSeg *ANTextSegs(ANTextSegList *list) {
    return reinterpret_cast<ANTextSeg *>(list + 1);
}
inline const ANTextSeg *ANTextSegs(const ANTextSegList *list) {
    return reinterpret_cast<const ANTextSeg *>(list + 1);
}

// Bytes of a segment list block with `capacity` slots.
inline size_t ANTextSegListBytes(uint16_t capacity) {
    return sizeof(ANTextSegList) + sizeof(ANTextSeg) * capacity;
}

// Frees the texts of every used segment and puts the used slots back on the free
// list; the list is left empty, its block and capacity unchanged.
void ANReleaseTextSegs(ANTextSegList *list);

// Appends one segment to the used list: kind 5 with a copy of `length` units of
// `text`, or kind 6 (one unit, no text). Grows the list by ANTEXTSEG_GROWTH slots
// first when taking a slot would leave none free. Returns 0, or 13 when the growth
// or the text copy fails; the list then holds the segments it held before (a growth
// that succeeded stays). The list block may move: *list is updated.
uint32_t ANAppendTextSeg(ANTextSegList **list, uint16_t kind, const uint16_t *text,
                         uint32_t length);

#endif  // ANNO_TRACKING_TEXT_TRACK_H
