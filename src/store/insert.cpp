// Ordered insertion: every entry reaches a document's table through ANInsertEntry.
//
// Annotation text. The type-5 and type-6 entries at one anchor hold, in list order,
// the annotation text of that anchor. A text entry stands in the list right after
// its last unit: its start is the kind-5 position just after its own units, or, for
// the last text entry at the anchor, the anchor's content position. Insertion keeps
// this so: new text is stored into the neighbouring text entry where it touches one,
// a placeholder inside a text splits it, and (when adding) the text positions of the
// annotations behind the new units move up by its width.
#include <cstring>
#include <initializer_list>

#include "hosts/heap.h"
#include "store/index.h"
#include "store/store.h"

namespace {

constexpr uint32_t kTextGrowth = 64;  // text buffers grow in steps of this many units

bool IsText(uint16_t type) { return type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER; }

// Types whose start and end are independent positions (ranges and cut markers);
// the others are points whose end is always one step after their start.
bool HasExtent(uint16_t type) {
    return type == AN_TYPE_HILITE || type == AN_TYPE_RANGE || type == AN_TYPE_CUTMARK;
}

uint32_t TextUnits(const ANEntry &entry) {
    if (entry.type == AN_TYPE_TEXT) return entry.record.textLength;
    return entry.type == AN_TYPE_PLACEHOLDER ? 1 : 0;
}

// The capacity, in units, a buffer needs to hold `units` with room to spare: the
// smallest step above `current` (0 for a new buffer) that is greater than `units`.
// False when that does not fit the 32-bit field.
bool CapacityFor(uint64_t units, uint32_t current, uint32_t *capacity) {
    uint64_t grown = current;
    if (grown <= units) grown += ((units - grown) / kTextGrowth + 1) * kTextGrowth;
    if (grown > UINT32_MAX) return false;
    *capacity = static_cast<uint32_t>(grown);
    return true;
}

uint16_t *NewTextBuffer(uint32_t capacity) {
    return static_cast<uint16_t *>(ANHeapAlloc(sizeof(uint16_t) * capacity));
}

void CopyUnits(uint16_t *to, const uint16_t *from, uint32_t units) {
    if (units != 0) std::memcpy(to, from, sizeof(uint16_t) * units);
}

// Gives `record` its own copy of its `text`; the text pointer is cleared. 13 when
// out of memory (the record is then unchanged).
uint32_t OwnTextCopy(ANAnnoRecord *record) {
    uint32_t capacity = 0;
    if (!CapacityFor(record->textLength, 0, &capacity)) return AN_ERR_NOMEM;
    uint16_t *buffer = NewTextBuffer(capacity);
    if (buffer == nullptr) return AN_ERR_NOMEM;
    CopyUnits(buffer, record->text, record->textLength);
    record->textBuffer = buffer;
    record->textCapacity = capacity;
    record->text = nullptr;
    return AN_OK;
}

// Makes room for `units` in an existing entry's text. 13 when out of memory, the
// entry's buffer and text unchanged.
uint32_t ReserveText(ANAnnoRecord &record, uint64_t units) {
    if (units < record.textCapacity) return AN_OK;
    uint32_t capacity = 0;
    if (!CapacityFor(units, record.textCapacity, &capacity)) return AN_ERR_NOMEM;
    void *grown = ANHeapReAlloc(record.textBuffer, sizeof(uint16_t) * capacity);
    if (grown == nullptr) return AN_ERR_NOMEM;
    record.textBuffer = static_cast<uint16_t *>(grown);
    record.textCapacity = capacity;
    return AN_OK;
}

// Takes a free slot for a new entry, links it in after `prev` and grows the table
// when only one free slot is left. 13 when that growth fails; the entry stays.
uint32_t LinkNewEntry(ANInstance *instance, uint16_t prev, uint16_t type,
                      const ANAnnoRecord &record, uint16_t flags, uint16_t *linked) {
    ANEntryTable *table = instance->entries;
    const uint16_t slot = ANTakeSlot(table);
    if (slot == AN_NONE) return AN_ERR_NOMEM;  // never: GrowBeforeInsert leaves two free
    ANEntry &entry = ANSlot(table, slot);
    entry.type = type;
    entry.flags = flags;
    entry.record = record;
    ANListInsertAfter(table, slot, prev);
    ANIndexChangedAfter(instance, prev);
    table->count++;
    if (linked != nullptr) *linked = slot;
    if (table->count + 1 == table->capacity) return ANGrowTable(&instance->entries);
    return AN_OK;
}

// Links the entry an insertion is for. Once it is in, a growth that fails (out of
// memory, or the table at its limit, which sets `full`) leaves the last free slot,
// and the next insertion grows first or is refused; 13 here would tell a caller
// that an annotation it handed a block with was not taken.
uint32_t LinkEntryFor(ANInstance *instance, uint16_t prev, uint16_t type,
                      const ANAnnoRecord &record, uint16_t flags) {
    const uint16_t before = instance->entries->count;
    const uint32_t rc = LinkNewEntry(instance, prev, type, record, flags, nullptr);
    return instance->entries->count != before ? AN_OK : rc;
}

// The first entry of a document: makes the table around it.
uint32_t InsertFirst(ANInstance *instance, uint16_t type, ANAnnoRecord *record, uint16_t flags) {
    uint16_t *ownText = nullptr;
    if (type == AN_TYPE_TEXT) {
        const uint32_t rc = OwnTextCopy(record);
        if (rc != AN_OK) return rc;
        ownText = record->textBuffer;
    }
    ANEntryTable *table = ANMakeTable();
    if (table == nullptr) {
        ANHeapFree(ownText);
        if (ownText != nullptr) record->textBuffer = nullptr;
        return AN_ERR_NOMEM;
    }
    table->hasText = IsText(type) ? 1 : 0;
    instance->entries = table;
    ANIndexForget(instance);
    return LinkNewEntry(instance, AN_NONE, type, *record, flags, nullptr);
}

// A table that kept only one free slot after a failed growth grows before that
// slot is taken, so a slot is always left after an insertion.
uint32_t GrowBeforeInsert(ANInstance *instance) {
    const ANEntryTable *table = instance->entries;
    if (table->count + 1 < table->capacity) return AN_OK;
    return ANGrowTable(&instance->entries);
}

// A range touching or overlapping the type-3 entry just before or after its
// place extends that entry instead of being stored. True when merged.
bool MergeRange(ANInstance *instance, uint16_t prev, uint16_t next, const ANAnnoRecord &record) {
    ANEntryTable *table = instance->entries;
    bool merged = false;
    auto within = [&record](const ANPos &pos) {
        return ANPosAtOrBefore(record.start, pos) && ANPosAtOrBefore(pos, record.end);
    };
    if (prev != AN_NONE && ANSlot(table, prev).type == AN_TYPE_RANGE) {
        ANAnnoRecord &p = ANSlot(table, prev).record;
        if (within(p.start) || within(p.end)) ANIndexChanged(instance, prev);
        if (within(p.start)) {
            p.start = record.start;
            merged = true;
        }
        if (within(p.end)) {
            p.end = record.end;
            merged = true;
        }
    }
    if (next != AN_NONE && ANSlot(table, next).type == AN_TYPE_RANGE) {
        ANAnnoRecord &n = ANSlot(table, next).record;
        if (within(n.start) || within(n.end)) ANIndexChanged(instance, next);
        if (within(n.start)) {
            n.start = record.start;
            merged = true;
        }
        if (within(n.end)) {
            n.end = record.end;
            return true;
        }
    }
    return merged;
}

// The annotation text around the place of new text at its anchor.
struct TextAround {
    uint64_t before = 0;             // units of the text entries before the place
    uint64_t after = 0;              // units of the text entries after the place
    uint16_t mergeTarget = AN_NONE;  // the nearest text entry before, when it has type 5
    uint16_t following = AN_NONE;    // the type-5 entry next after, unless a placeholder is first
};

// (i, 0xFFFFFFFF) and (i, 0) sort as one anchor, so their entries interleave in the
// list; each keeps its own text.
bool SortsWithAnchor(const ANPos &a, const ANPos &b) {
    const auto sub = [](uint32_t s) { return s == ANPOS_NOSUBITEM ? 0 : s; };
    return a.itemId == b.itemId && sub(a.subItemId) == sub(b.subItemId);
}

TextAround LookAround(const ANEntryTable *table, uint16_t prev, uint16_t next, const ANPos &start) {
    TextAround around;
    bool metText = false;
    for (uint16_t i = prev; i != AN_NONE; i = ANSlot(table, i).prev) {
        const ANEntry &entry = ANSlot(table, i);
        if (!SortsWithAnchor(entry.record.start, start)) break;
        if (!ANSameAnchor(entry.record.start, start) || !IsText(entry.type)) continue;
        around.before += TextUnits(entry);
        if (!metText && entry.type == AN_TYPE_TEXT) around.mergeTarget = i;
        metText = true;
    }
    bool metFollowing = false;
    for (uint16_t i = next; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        if (!SortsWithAnchor(entry.record.start, start)) break;
        if (!ANSameAnchor(entry.record.start, start) || !IsText(entry.type)) continue;
        around.after += TextUnits(entry);
        if (!metFollowing && entry.type == AN_TYPE_TEXT) around.following = i;
        metFollowing = true;
    }
    // New text placed by a content position comes after all text at its anchor.
    if (start.kind != ANPOS_ANNOTEXT) around.following = AN_NONE;
    return around;
}

// Whether new text of an added annotation at kind-5 index k lies inside the text
// at its anchor, so that every offset derived from k stays inside a buffer: k is
// the end of the text before the place, or an offset within the type-5 entry that
// follows it. An anchor without annotation text has no kind-5 positions.
bool TextIndexInside(const ANEntryTable *table, const TextAround &around, uint32_t k) {
    if (around.before + around.after == 0) return false;
    if (k == around.before) return true;
    if (k < around.before || around.following == AN_NONE) return false;
    return k - around.before <= ANSlot(table, around.following).record.textLength;
}

// The first entry that shifting text positions at `anchor` can change: the entries
// before it neither start at the anchor nor end there or later. The head of the list
// without an index.
uint16_t FirstShiftCandidate(const ANInstance *instance, const ANPos &anchor) {
    const ANEntryTable *table = instance->entries;
    const ANEntryIndex *index = ANCurrentIndex(instance);
    if (index == nullptr) return table->first;
    // The anchor's first unit of text sorts before every position at the anchor.
    const ANPos low{anchor.itemId, anchor.subItemId, ANPOS_ANNOTEXT, 0};
    uint32_t r = ANIndexRanksBefore(table, index, low);
    const uint32_t reaching = ANIndexFirstReaching(table, index, low);
    if (reaching < r) r = reaching;
    return r < index->valid ? ANIndexArraysOf(index).order[r] : AN_NONE;
}

// The last entry that sorts before every position at `anchor`, found through the
// index; AN_NONE without an index or when there is none.
uint16_t LastBeforeAnchor(const ANInstance *instance, const ANPos &anchor) {
    const ANEntryIndex *index = ANCurrentIndex(instance);
    if (index == nullptr) return AN_NONE;
    const ANPos low{anchor.itemId, anchor.subItemId, ANPOS_ANNOTEXT, 0};
    const uint32_t r = ANIndexRanksBefore(instance->entries, index, low);
    return r == 0 ? AN_NONE : ANIndexArraysOf(index).order[r - 1];
}

// A text index moved up by `width`. Indices past every unit an anchor's text can
// hold come only from callers; they stop at the greatest index rather than wrap round
// below the indices they sorted after, which would put an entry's start after its end.
uint32_t ShiftedIndex(uint32_t index, uint32_t width) {
    return index > UINT32_MAX - width ? UINT32_MAX : index + width;
}

// Moves the text positions of the entries around new text of `width` units
// that goes in at record.start (b = units already before it at the anchor), and
// the record's own text positions.
void ShiftTextPositions(ANInstance *instance, uint16_t type, ANAnnoRecord *record, uint32_t b,
                        uint32_t width) {
    ANEntryTable *table = instance->entries;
    const ANPos anchor = record->start;
    const bool inText = anchor.kind == ANPOS_ANNOTEXT;
    const uint32_t k = anchor.textIndex;
    const uint16_t from = FirstShiftCandidate(instance, anchor);
    bool changed = false;
    for (uint16_t i = from; i != AN_NONE; i = ANSlot(table, i).next) {
        ANEntry &entry = ANSlot(table, i);
        ANPos &start = entry.record.start;
        ANPos &end = entry.record.end;
        if (ANStartPastAnchor(start, anchor)) break;
        const ANPos startWas = start;
        const ANPos endWas = end;
        if (inText) {
            if (start.kind == ANPOS_ANNOTEXT && ANSameAnchor(start, anchor) &&
                start.textIndex >= k) {
                // A type-5 entry whose text ends at k takes new text there; a
                // placeholder goes in behind it and leaves it where it is.
                const bool keepsItsText = type == AN_TYPE_PLACEHOLDER &&
                                          entry.type == AN_TYPE_TEXT && start.textIndex == k;
                const bool moves =
                    HasExtent(entry.type) || entry.type == AN_TYPE_TEXT || start.textIndex > k;
                if (moves && !keepsItsText) start.textIndex = ShiftedIndex(start.textIndex, width);
                if (!HasExtent(entry.type)) end = ANStepAfter(start);
            }
            if (HasExtent(entry.type) && end.kind == ANPOS_ANNOTEXT && ANSameAnchor(end, anchor) &&
                end.textIndex > k) {
                end.textIndex = ShiftedIndex(end.textIndex, width);
            }
            // An empty range at k (or one ending at k under the other spelling of the
            // anchor) would now end before its start: it stays empty where its start went.
            if (HasExtent(entry.type) && ANPosBefore(end, start)) end = start;
        } else {
            if (HasExtent(entry.type) && ANPosEqual(end, anchor)) {
                // A range that ended at the anchor now ends where the new text begins,
                // unless that would put its end before its start: an empty range at the
                // anchor, or one from an item to its first character, whose text sorts
                // before the item itself. Those keep their end and cover no new text.
                ANPos moved = end;
                moved.kind = ANPOS_ANNOTEXT;
                moved.textIndex = b;
                if (ANPosAtOrBefore(start, moved)) end = moved;
            }
            const bool bothText = entry.type == AN_TYPE_TEXT && type == AN_TYPE_TEXT;
            if (!HasExtent(entry.type) && !bothText && ANPosEqual(start, anchor)) {
                // A point at the anchor, or the former last text entry before a new
                // placeholder, moves into the annotation text.
                start.kind = ANPOS_ANNOTEXT;
                start.textIndex = b;
                end = ANStepAfter(start);
            }
        }
        if (!changed && (std::memcmp(&startWas, &start, sizeof(ANPos)) != 0 ||
                         std::memcmp(&endWas, &end, sizeof(ANPos)) != 0)) {
            ANIndexChanged(instance, i);
            changed = true;
        }
    }
    if (record->start.kind == ANPOS_ANNOTEXT) {
        record->start.textIndex = ShiftedIndex(record->start.textIndex, width);
    }
    if (record->end.kind == ANPOS_ANNOTEXT) {
        record->end.textIndex = ShiftedIndex(record->end.textIndex, width);
    }
}

// A placeholder that goes inside the text of the following entry X splits
// it; the units before it move to a new type-5 entry S linked in at the place,
// which becomes the placeholder's `prev`. S stands for the same annotation as X:
// it takes X's tag, userData, value and flags, so clearing by tag treats both
// halves alike, and a userData block they then share is freed once, by S, which
// comes first (ANClearUserData clears the same value in the entries after it).
uint32_t SplitText(ANInstance *instance, uint16_t *prev, uint16_t following, uint32_t b,
                   const ANAnnoRecord &record, uint16_t *buffer, uint32_t capacity) {
    const uint32_t k = record.start.textIndex - 1;
    const uint32_t m = k - b;
    ANEntry &x = ANSlot(instance->entries, following);

    ANAnnoRecord split = x.record;
    split.start = record.start;
    split.start.textIndex = k;
    split.end = ANStepAfter(split.start);
    split.text = nullptr;
    split.textBuffer = buffer;
    split.textLength = m;
    split.textCapacity = capacity;
    CopyUnits(buffer, x.record.textBuffer, m);
    const uint32_t rest = x.record.textLength - m;
    if (rest != 0) {
        std::memmove(x.record.textBuffer, x.record.textBuffer + m, sizeof(uint16_t) * rest);
    }
    x.record.textLength = rest;
    return LinkNewEntry(instance, *prev, AN_TYPE_TEXT, split, x.flags, prev);
}

// Stores new text into the merge target, into the following text entry,
// or into the record's own buffer for a new entry (*stored false).
uint32_t StoreText(ANEntryTable *table, ANAnnoRecord *record, const TextAround &around,
                   bool *stored) {
    const uint32_t width = record->textLength;
    const bool inText = record->start.kind == ANPOS_ANNOTEXT;
    // Where the new units begin in the anchor's text (start stands just after them).
    const uint64_t begin = static_cast<uint64_t>(record->start.textIndex) - width;
    // The units were copied into the record's own buffer beforehand; text that goes
    // into another entry is copied from there and the buffer given back.
    const uint16_t *units = record->textBuffer;
    auto giveBack = [record] {
        ANHeapFree(record->textBuffer);
        record->textBuffer = nullptr;
        record->textCapacity = 0;
    };
    *stored = true;
    if (around.mergeTarget != AN_NONE && (!inText || begin == around.before)) {
        ANAnnoRecord &target = ANSlot(table, around.mergeTarget).record;
        CopyUnits(target.textBuffer + target.textLength, units, width);  // room reserved
        target.textLength += width;
        giveBack();
        return AN_OK;
    }
    if (around.following != AN_NONE) {
        ANAnnoRecord &target = ANSlot(table, around.following).record;
        if (record->start.textIndex < width || begin < around.before ||
            begin - around.before > target.textLength) {
            giveBack();
            return AN_ERR_BADARG;
        }
        const auto offset = static_cast<uint32_t>(begin - around.before);
        const uint32_t moved = target.textLength - offset;
        if (moved != 0 && width != 0) {
            std::memmove(target.textBuffer + offset + width, target.textBuffer + offset,
                         sizeof(uint16_t) * moved);
        }
        CopyUnits(target.textBuffer + offset, units, width);  // room reserved
        target.textLength += width;
        giveBack();
        return AN_OK;
    }
    *stored = false;
    return AN_OK;
}

// The start index a placeholder's record has once shifting has moved it past itself.
uint32_t SplitIndex(const ANAnnoRecord &record) {
    const uint32_t k = record.start.textIndex;
    return record.start.kind == ANPOS_ANNOTEXT ? ShiftedIndex(k, 1) : k;
}

// Makes, before any position moves, every allocation that storing the text or the
// placeholder of `record` can need, so that running out of memory changes nothing:
// room in the entries the text may go into, the record's own copy of its text, or
// for a placeholder that splits a text, a free slot more and the split's buffer.
uint32_t PrepareText(ANInstance *instance, uint16_t type, ANAnnoRecord *record,
                     const TextAround &around, bool splits, uint16_t **splitBuffer,
                     uint32_t *splitCapacity) {
    if (type == AN_TYPE_TEXT) {
        for (const uint16_t target : {around.mergeTarget, around.following}) {
            if (target == AN_NONE) continue;
            ANAnnoRecord &r = ANSlot(instance->entries, target).record;
            const uint32_t rc = ReserveText(r, uint64_t{r.textLength} + record->textLength);
            if (rc != AN_OK) return rc;
        }
        return OwnTextCopy(record);
    }
    if (!splits) return AN_OK;
    const ANEntryTable *table = instance->entries;
    if (table->count + 2u >= table->capacity) {
        if (table->capacity + ANTABLE_GROWTH > ANTABLE_MAX_CAPACITY) return AN_ERR_NOMEM;
        if (ANGrowTable(&instance->entries) != AN_OK) return AN_ERR_NOMEM;
    }
    const ANEntry &x = ANSlot(instance->entries, around.following);
    const uint32_t m = SplitIndex(*record) - 1 - uint32_t(around.before);
    if (m > x.record.textLength) return AN_ERR_BADARG;  // kept out by TextIndexInside
    if (!CapacityFor(m, 0, splitCapacity)) return AN_ERR_NOMEM;
    *splitBuffer = NewTextBuffer(*splitCapacity);
    return *splitBuffer == nullptr ? AN_ERR_NOMEM : AN_OK;
}

// Inserting into a document that has a table: the place, then by type.
uint32_t InsertIntoTable(ANInstance *instance, uint16_t type, ANAnnoRecord *record, uint32_t mode,
                         uint16_t flags) {
    if (instance->entries->full != 0) return AN_ERR_NOMEM;
    if (GrowBeforeInsert(instance) != AN_OK) return AN_ERR_NOMEM;
    ANEntryTable *table = instance->entries;

    // After the last entry that starts at or before the record.
    uint16_t prev = table->last;
    while (prev != AN_NONE && ANPosBefore(record->start, ANSlot(table, prev).record.start)) {
        prev = ANSlot(table, prev).prev;
    }
    uint16_t next = prev == AN_NONE ? table->first : ANSlot(table, prev).next;

    // A record that merges into an entry leaves its block (if the caller handed one
    // over) without a holder; the document keeps it for ANClearUserData.
    const uint64_t block = (flags & ANENTRY_OWNS_USERDATA) != 0 ? record->userData : 0;
    if (type == AN_TYPE_RANGE && MergeRange(instance, prev, next, *record)) {
        ANKeepOrphanBlock(instance, block);
        return AN_OK;
    }
    if (!IsText(type)) return LinkEntryFor(instance, prev, type, *record, flags);

    // Annotation text goes before the other annotations that start where it does.
    while (prev != AN_NONE && !IsText(ANSlot(table, prev).type) &&
           ANPosEqual(ANSlot(table, prev).record.start, record->start)) {
        next = prev;
        prev = ANSlot(table, prev).prev;
    }
    TextAround around = LookAround(table, prev, next, record->start);
    if (mode == ANINSERT_COPY_APART) around.mergeTarget = around.following = AN_NONE;
    const uint32_t width = type == AN_TYPE_TEXT ? record->textLength : 1;
    if (mode == ANINSERT_ADD && record->start.kind == ANPOS_ANNOTEXT &&
        !TextIndexInside(table, around, record->start.textIndex)) {
        return AN_ERR_BADARG;
    }
    if (around.before + around.after + width > UINT32_MAX) {
        return AN_ERR_NOMEM;  // the anchor's text would outgrow its 32-bit indices
    }
    const auto before = static_cast<uint32_t>(around.before);
    // A placeholder inside a text (by the index it will have past the shift) splits it.
    const uint32_t at = SplitIndex(*record);
    const bool splits = type == AN_TYPE_PLACEHOLDER && mode == ANINSERT_ADD &&
                        around.following != AN_NONE && at > around.before + 1;
    uint16_t *splitBuffer = nullptr;
    uint32_t splitCapacity = 0;
    uint32_t rc = PrepareText(instance, type, record, around, splits, &splitBuffer, &splitCapacity);
    if (rc != AN_OK) return rc;
    table = instance->entries;  // a growth may have moved it
    table->hasText = 1;
    if (mode == ANINSERT_ADD) ShiftTextPositions(instance, type, record, before, width);

    if (type == AN_TYPE_PLACEHOLDER) {
        if (splits) {
            rc = SplitText(instance, &prev, around.following, before, *record, splitBuffer,
                           splitCapacity);
        }
    } else {
        bool stored = false;
        rc = StoreText(table, record, around, &stored);
        if (rc == AN_OK && stored) {
            ANKeepOrphanBlock(instance, block);
            return AN_OK;
        }
    }
    if (rc != AN_OK) return rc;
    return LinkEntryFor(instance, prev, type, *record, flags);
}

}  // namespace

uint32_t ANInsertEntry(ANInstance *instance, uint16_t type, ANAnnoRecord *record, uint32_t mode,
                       uint16_t entryFlags) {
    if (instance == nullptr || record == nullptr) return AN_ERR_BADARG;
    if (type < AN_TYPE_HILITE || type > AN_TYPE_CUTMARK) return AN_ERR_BADARG;
    if (mode != ANINSERT_ADD && mode != ANINSERT_COPY && mode != ANINSERT_COPY_APART) {
        return AN_ERR_BADARG;
    }

    // Text given as an entry's buffer (copying) is read through `text`; the record
    // gets its buffer back whatever happens, so the source entry stays as it was.
    const bool fromBuffer = type == AN_TYPE_TEXT && record->textBuffer != nullptr;
    const uint16_t *savedText = record->text;
    uint16_t *savedBuffer = record->textBuffer;
    const uint32_t savedCapacity = record->textCapacity;
    if (fromBuffer) {
        record->text = record->textBuffer;
        record->textBuffer = nullptr;
    }
    if (type == AN_TYPE_TEXT && record->text == nullptr && record->textLength != 0) {
        return AN_ERR_BADARG;  // (never with a buffer, which is not null)
    }

    uint32_t rc = AN_OK;
    if (instance->entries == nullptr) {
        if (mode == ANINSERT_ADD && IsText(type) && record->start.kind == ANPOS_ANNOTEXT) {
            rc = AN_ERR_BADARG;  // no annotation text yet, so no position inside it
        } else {
            rc = InsertFirst(instance, type, record, entryFlags);
        }
    } else {
        const ANPos anchor = record->start;
        const bool shifts = mode == ANINSERT_ADD && IsText(type);
        // Entries up to this one sort before the anchor and are neither shifted nor moved.
        const uint16_t inOrder = shifts ? LastBeforeAnchor(instance, anchor) : AN_NONE;
        rc = InsertIntoTable(instance, type, record, mode, entryFlags);
        // Shifting text positions can leave entries behind ones they now sort before
        // (a point moved into new text, a range moved past a point at the same
        // index, the new entry itself): put the list back in document order.
        if (shifts) {
            ANRestoreOrder(instance->entries, anchor, inOrder);
            ANIndexChangedAfter(instance, inOrder);
        }
    }

    if (fromBuffer) {
        record->text = savedText;
        record->textBuffer = savedBuffer;
        record->textCapacity = savedCapacity;
    }
    return rc;
}
