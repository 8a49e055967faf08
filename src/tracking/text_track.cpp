// Annotation text tracks: the caller's record that caches the annotation text of one
// anchor for ANGetAnnoText, its segment list, starting and ending it.
#include "tracking/text_track.h"

#include <cstring>

#include "hosts/heap.h"

namespace {

// Slots [from, to) pushed one after another on the front of the free list.
void ANPushFreeSlots(ANTextSegList *list, uint16_t from, uint16_t to) {
    ANTextSeg *slots = ANTextSegs(list);
    for (uint16_t i = from; i < to; ++i) {
        slots[i].next = list->segFree;
        slots[i].prev = AN_NONE;
        list->segFree = i;
    }
}

uint32_t ANGrowTextSegs(ANTextSegList **list) {
    const uint16_t oldCapacity = (*list)->segCapacity;
    const auto newCapacity = static_cast<uint16_t>(oldCapacity + ANTEXTSEG_GROWTH);
    if (newCapacity <= oldCapacity) return AN_ERR_NOMEM;
    void *grown = ANHeapReAlloc(*list, ANTextSegListBytes(newCapacity));
    if (grown == nullptr) return AN_ERR_NOMEM;
    *list = static_cast<ANTextSegList *>(grown);
    (*list)->segCapacity = newCapacity;
    ANPushFreeSlots(*list, oldCapacity, newCapacity);
    return AN_OK;
}

}  // namespace

void ANReleaseTextSegs(ANTextSegList *list) {
    ANTextSeg *slots = ANTextSegs(list);
    uint16_t i = list->segHead;
    while (i != AN_NONE) {
        ANTextSeg &seg = slots[i];
        const uint16_t following = seg.next;
        ANHeapFree(seg.segText);
        seg.segText = nullptr;
        seg.next = list->segFree;
        list->segFree = i;
        i = following;
    }
    list->segCount = 0;
    list->segHead = AN_NONE;
    list->segTail = AN_NONE;
}

uint32_t ANAppendTextSeg(ANTextSegList **list, uint16_t kind, const uint16_t *text,
                         uint32_t length) {
    // One slot always stays free, so the slot taken below exists.
    if (static_cast<uint32_t>((*list)->segCount) + 1 >= (*list)->segCapacity) {
        const uint32_t rc = ANGrowTextSegs(list);
        if (rc != AN_OK) return rc;
    }
    // The copy is made before a slot is taken, so a failure leaves both lists whole.
    uint16_t *copy = nullptr;
    if (kind == ANTEXTSEG_TEXT && length > 0) {
        copy = ANHeapNew<uint16_t>(length, false);
        if (copy == nullptr) return AN_ERR_NOMEM;
        std::memcpy(copy, text, sizeof(uint16_t) * length);
    }

    ANTextSegList *l = *list;
    ANTextSeg *slots = ANTextSegs(l);
    const uint16_t slot = l->segFree;
    ANTextSeg &seg = slots[slot];
    l->segFree = seg.next;
    seg.segKind = kind;
    seg.segLength = kind == ANTEXTSEG_TEXT ? length : 1;
    seg.segText = copy;
    seg.next = AN_NONE;
    seg.prev = l->segTail;
    if (l->segTail == AN_NONE) {
        l->segHead = slot;
    } else {
        slots[l->segTail].next = slot;
    }
    l->segTail = slot;
    l->segCount++;
    return AN_OK;
}

extern "C" AN_API uint32_t ANStartAnnoTextTrack(DAHandle, ANAnnoTextTrack *track) {
    if (track == nullptr) return AN_ERR_BADARG;
    *track = ANAnnoTextTrack{};
    auto *list = static_cast<ANTextSegList *>(ANHeapAlloc(ANTextSegListBytes(ANTEXTSEG_GROWTH)));
    if (list == nullptr) return AN_ERR_NOMEM;
    *list = ANTextSegList{};
    list->segHead = AN_NONE;
    list->segTail = AN_NONE;
    list->segFree = 0;
    list->segCount = 0;
    list->segCapacity = ANTEXTSEG_GROWTH;
    ANTextSeg *slots = ANTextSegs(list);
    for (uint16_t i = 0; i < ANTEXTSEG_GROWTH; ++i) {
        slots[i] = ANTextSeg{};
        slots[i].next = i + 1 < ANTEXTSEG_GROWTH ? static_cast<uint16_t>(i + 1) : AN_NONE;
        slots[i].prev = i == 0 ? AN_NONE : static_cast<uint16_t>(i - 1);
    }
    track->segs = list;
    return AN_OK;
}

extern "C" AN_API uint32_t ANEndAnnoTextTrack(DAHandle, ANAnnoTextTrack *track) {
    if (track == nullptr) return AN_OK;
    if (track->segs != nullptr) {
        ANReleaseTextSegs(track->segs);
        ANHeapFree(track->segs);
    }
    *track = ANAnnoTextTrack{};
    return AN_OK;
}
