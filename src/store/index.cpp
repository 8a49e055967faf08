// Keeping the lookup index of an annotation table: allocation and growth, bringing
// it up to date from the first stale rank, and the searches over it.
#include "store/index.h"

#include <cstring>

#include "hosts/heap.h"
#include "positions/order.h"
#include "tracking/list_step.h"

namespace {

// The first rank below `valid` from which `reached(rank)` holds (it holds from some
// rank on, or nowhere), or `valid`: a binary search over the current ranks.
template <typename Reached>
uint32_t FirstRankWhere(uint32_t valid, Reached reached) {
    uint32_t lo = 0;
    uint32_t hi = valid;
    while (lo < hi) {
        const uint32_t mid = lo + (hi - lo) / 2;
        if (reached(mid)) {
            hi = mid;
        } else {
            lo = mid + 1;
        }
    }
    return lo;
}

constexpr uint32_t kMaxCapacity = 65536;  // every 16-bit slot index
constexpr uint32_t kCapacityStep = 16;    // capacities are multiples of this
constexpr uint32_t kHeadroomDivisor = 8;  // room for an eighth more slots than needed
constexpr uint32_t kNoRank = 0xFFFFFFFF;

bool IsText(uint16_t type) { return type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER; }

// Of `a` and `b` (either may be AN_NONE), the entry whose end sorts last; `a` on a tie.
uint16_t Farther(const ANEntryTable *table, uint16_t a, uint16_t b) {
    if (a == AN_NONE) return b;
    if (b == AN_NONE) return a;
    return ANPosBefore(ANSlot(table, a).record.end, ANSlot(table, b).record.end) ? b : a;
}

// The rank of `slot` when it lies in the current part of the index, else kNoRank.
uint32_t CurrentRank(const ANEntryIndex *index, uint16_t slot) {
    if (slot >= index->capacity) return kNoRank;
    const ANIndexArrays a = ANIndexArraysOf(index);
    const uint32_t r = a.rank[slot];
    return r < index->valid && a.order[r] == slot ? r : kNoRank;
}

// Marks ranks from `r` on as stale.
void Truncate(ANEntryIndex *index, uint32_t r) {
    if (r >= index->valid) return;
    const ANIndexArrays a = ANIndexArraysOf(index);
    // The text entries below `r` are a prefix of text[]: their ranks are current.
    index->texts = FirstRankWhere(index->texts, [&](uint32_t k) { return a.rank[a.text[k]] >= r; });
    index->valid = r;
}

// An index block with room for `capacity` entries, taking over what `old` holds
// (which is freed); null when out of memory (`old` is then kept).
ANEntryIndex *Resized(ANEntryIndex *old, uint32_t capacity) {
    auto *index = static_cast<ANEntryIndex *>(ANHeapAlloc(ANIndexBlockBytes(capacity), true));
    if (index == nullptr) return nullptr;
    index->capacity = capacity;
    index->valid = 0;
    index->texts = 0;
    index->textHint = 0;
    if (old != nullptr) {
        const ANIndexArrays from = ANIndexArraysOf(old);
        const ANIndexArrays to = ANIndexArraysOf(index);
        const size_t ranks = sizeof(uint16_t) * old->valid;
        std::memcpy(to.order, from.order, ranks);
        std::memcpy(to.rank, from.rank, sizeof(uint16_t) * old->capacity);
        std::memcpy(to.text, from.text, sizeof(uint16_t) * old->texts);
        std::memcpy(to.farAll, from.farAll, ranks);
        std::memcpy(to.farCover, from.farCover, ranks);
        std::memcpy(to.farRange, from.farRange, ranks);
        index->valid = old->valid;
        index->texts = old->texts;
        ANHeapFree(old);
    }
    return index;
}

// Extends the current part of the index to the end of the ordered list. False when
// the list does not fit the index (it then has to be made anew).
bool CatchUp(const ANEntryTable *table, ANEntryIndex *index) {
    const ANIndexArrays a = ANIndexArraysOf(index);
    uint32_t r = index->valid;
    uint16_t slot = r == 0 ? table->first : ANSlot(table, a.order[r - 1]).next;
    while (slot != AN_NONE) {
        if (r >= index->capacity || slot >= index->capacity) return false;
        const ANEntry &entry = ANSlot(table, slot);
        a.order[r] = slot;
        a.rank[slot] = static_cast<uint16_t>(r);
        if (IsText(entry.type)) a.text[index->texts++] = slot;
        const bool range = entry.type == AN_TYPE_RANGE;
        const bool cover = range || entry.type == AN_TYPE_CUTMARK;
        const uint16_t none = AN_NONE;
        a.farAll[r] = Farther(table, r == 0 ? none : a.farAll[r - 1], slot);
        a.farCover[r] = Farther(table, r == 0 ? none : a.farCover[r - 1], cover ? slot : none);
        a.farRange[r] = Farther(table, r == 0 ? none : a.farRange[r - 1], range ? slot : none);
        index->valid = ++r;
        slot = entry.next;
    }
    return r == table->count;
}

}  // namespace

ANIndexArrays ANIndexArraysOf(const ANEntryIndex *index) {
    auto *base = reinterpret_cast<uint16_t *>(const_cast<ANEntryIndex *>(index) + 1);
    const uint32_t n = index->capacity;
    return ANIndexArrays{base, base + n, base + 2 * n, base + 3 * n, base + 4 * n, base + 5 * n};
}

ANEntryIndex *ANCurrentIndex(const ANInstance *constInstance) {
    if (constInstance == nullptr) return nullptr;
    // The index is the instance's cache; every instance is a heap record of its own.
    auto *instance = const_cast<ANInstance *>(constInstance);
    const ANEntryTable *table = instance->entries;
    if (table == nullptr || table->count < ANINDEX_MIN_ENTRIES) return nullptr;

    ANEntryIndex *index = instance->index;
    if (index == nullptr || index->capacity < table->capacity) {
        uint32_t capacity = table->capacity + table->capacity / kHeadroomDivisor;
        capacity = (capacity + kCapacityStep - 1) / kCapacityStep * kCapacityStep;
        if (capacity > kMaxCapacity) capacity = kMaxCapacity;
        ANEntryIndex *grown = Resized(index, capacity);
        if (grown == nullptr) {
            ANFreeIndex(instance);
            return nullptr;
        }
        instance->index = index = grown;
    }
    if (index->valid > table->count) Truncate(index, 0);
    if (!CatchUp(table, index)) {
        // Only a list that is not what the index was told: start over once.
        Truncate(index, 0);
        if (!CatchUp(table, index)) {
            ANFreeIndex(instance);
            return nullptr;
        }
    }
    return index;
}

void ANIndexChangedAfter(ANInstance *instance, uint16_t prev) {
    ANEntryIndex *index = instance->index;
    if (index == nullptr) return;
    if (prev == AN_NONE) {
        Truncate(index, 0);
        return;
    }
    const uint32_t r = CurrentRank(index, prev);
    // Linked behind the last current entry, the current part stays as it is.
    if (r != kNoRank) Truncate(index, r + 1);
}

void ANIndexChanged(ANInstance *instance, uint16_t slot) {
    ANEntryIndex *index = instance->index;
    if (index == nullptr) return;
    const uint32_t r = CurrentRank(index, slot);
    if (r != kNoRank) Truncate(index, r);
}

void ANIndexForget(ANInstance *instance) {
    if (instance->index != nullptr) Truncate(instance->index, 0);
}

void ANFreeIndex(ANInstance *instance) {
    ANHeapFree(instance->index);
    instance->index = nullptr;
}

uint32_t ANIndexRanksAtOrBefore(const ANEntryTable *table, const ANEntryIndex *index,
                                const ANPos &pos) {
    const uint16_t *order = ANIndexArraysOf(index).order;
    return FirstRankWhere(index->valid, [&](uint32_t r) {
        return ANPosBefore(pos, ANSlot(table, order[r]).record.start);
    });
}

uint32_t ANIndexRanksBefore(const ANEntryTable *table, const ANEntryIndex *index,
                            const ANPos &pos) {
    const uint16_t *order = ANIndexArraysOf(index).order;
    return FirstRankWhere(index->valid, [&](uint32_t r) {
        return !ANPosBefore(ANSlot(table, order[r]).record.start, pos);
    });
}

uint32_t ANIndexFirstReaching(const ANEntryTable *table, const ANEntryIndex *index,
                              const ANPos &pos) {
    const uint16_t *farthest = ANIndexArraysOf(index).farAll;
    return FirstRankWhere(index->valid, [&](uint32_t r) {
        return farthest[r] != AN_NONE && !ANPosBefore(ANSlot(table, farthest[r]).record.end, pos);
    });
}

uint16_t ANFirstEntryNotBefore(const ANInstance *instance, const ANPos &pos) {
    const ANEntryTable *table = instance->entries;
    if (table == nullptr) return AN_NONE;
    const ANEntryIndex *index = ANCurrentIndex(instance);
    if (index == nullptr) return ANNextEntryNotBefore(table, AN_NONE, pos);
    // Before the first entry that starts after `pos`, the first one that reaches it.
    uint32_t r = ANIndexRanksAtOrBefore(table, index, pos);
    const uint32_t reaching = ANIndexFirstReaching(table, index, pos);
    if (reaching < r) r = reaching;
    return r < index->valid ? ANIndexArraysOf(index).order[r] : AN_NONE;
}

uint16_t ANFirstAtAnchor(const ANInstance *instance, const ANPos &pos) {
    const ANEntryTable *table = instance->entries;
    if (table == nullptr) return AN_NONE;
    const ANEntryIndex *index = ANCurrentIndex(instance);
    if (index == nullptr) {
        uint16_t i = table->first;
        while (i != AN_NONE && !ANSameAnchor(ANSlot(table, i).record.start, pos)) {
            i = ANSlot(table, i).next;
        }
        return i;
    }
    // Every start with the anchor of `pos` sorts between the anchor's first text unit
    // and its content position; so do starts at the one other anchor that shares the
    // order with it ((i, 0xFFFFFFFF) and (i, 0)), which the scan passes over.
    const ANPos low{pos.itemId, pos.subItemId, ANPOS_ANNOTEXT, 0};
    const uint16_t *order = ANIndexArraysOf(index).order;
    for (uint32_t r = ANIndexRanksBefore(table, index, low); r < index->valid; ++r) {
        const ANPos &start = ANSlot(table, order[r]).record.start;
        if (ANSameAnchor(start, pos)) return order[r];
        const uint32_t s = start.subItemId == ANPOS_NOSUBITEM ? 0 : start.subItemId;
        const uint32_t p = pos.subItemId == ANPOS_NOSUBITEM ? 0 : pos.subItemId;
        if (start.itemId != pos.itemId || s != p) break;
    }
    return AN_NONE;
}
