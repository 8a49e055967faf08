// Range splitting: the entry from ANAddRecord and the trimming of the range's ends
// past skipped items and positions that a range or a cut marker already covers.
#include "ranges/split.h"

#include <cstring>

#include "hosts/modules.h"
#include "positions/order.h"
#include "ranges/walk.h"

namespace {

// Bytes of the caller's record that the entry record takes over.
constexpr size_t kRangeRecordBytes = AN_RECORD_SIZE_SHORT;

// The range begins at its first good position before its end; without one, at the
// last position examined (the old start when none was).
void ANTrimStart(DAHandle doc, const ANInstance *instance, ANAnnoRecord *entry) {
    ANPos last = entry->start;
    ANPos x = entry->start;
    while (ANPosBefore(x, entry->end)) {
        last = x;
        if (ANIsGoodPos(instance, x)) {
            entry->start = x;
            return;
        }
        if (!ANStepRangePos(doc, &x)) break;
    }
    entry->start = last;
}

// The range ends right after its last good position up to and including its end
// position, never later than before. Without a position after that one (the
// document's end) it ends one step past it, as a point does, and so still covers it.
void ANPullInEnd(DAHandle doc, const ANInstance *instance, ANAnnoRecord *entry) {
    ANPos good = entry->start;
    ANPos x = entry->start;
    while (ANPosAtOrBefore(x, entry->end)) {
        if (ANIsGoodPos(instance, x)) good = x;
        if (!ANStepRangePos(doc, &x)) break;
    }
    ANPos after = good;
    if (!ANStepRangePos(doc, &after)) after = ANStepAfter(good);
    if (ANPosBefore(after, entry->end)) entry->end = after;
}

}  // namespace

bool ANStepRangePos(DAHandle doc, ANPos *pos) {
    ANPos next{};
    if (ANNextPos(doc, pos, &next) != AN_OK) return false;
    *pos = next;
    return true;
}

bool ANIsSkippedPos(const ANInstance *instance, const ANPos &pos) {
    CHItemInfo info{};
    if (CHGetItem(instance->chunker, ANMOD_CLASS_ITEM, pos.itemId, &info, nullptr) != 0) {
        return false;
    }
    return info.field1 >= ANMOD_ITEM_SKIP_FIRST && info.field1 <= ANMOD_ITEM_SKIP_LAST;
}

bool ANIsGoodPos(const ANInstance *instance, const ANPos &pos) {
    return !ANIsSkippedPos(instance, pos) && ANPosInRangeOrMark(instance, &pos) == 0;
}

uint32_t ANSplitRangeAnno(DAHandle doc, const ANAnnoRecord *record, ANAnnoRecord *entry,
                          uint32_t *insertLast, uint16_t entryFlags) {
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    if (record == nullptr || entry == nullptr || insertLast == nullptr) return AN_ERR_BADARG;
    *insertLast = 0;
    std::memcpy(entry, record, kRangeRecordBytes);

    ANTrimStart(doc, instance, entry);
    ANPullInEnd(doc, instance, entry);
    if (ANPosEqual(entry->start, entry->end)) {
        // An empty range grows to one step. Past the document's last position there is
        // no next position; the step a point annotation takes keeps the range from
        // staying empty.
        if (!ANStepRangePos(doc, &entry->end)) entry->end = ANStepAfter(entry->start);
        *insertLast = 1;
        return AN_OK;
    }
    return ANCutRangeAnno(doc, instance, entry, insertLast, entryFlags);
}
