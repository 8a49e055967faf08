// Copying every annotation and per-document style of one document into another.
//
// Where both documents have annotation text at an anchor (a shared anchor), the
// destination's text stays first and the copied text follows it: the destination's
// last text entry there, which stood at the anchor's content position, moves to the
// kind-5 position just after its text, and every kind-5 position of a copied record
// at the anchor is renumbered past the destination's units there. Copied text at such
// an anchor gets entries of its own. Elsewhere a copy keeps its positions as they are.
#include "anno/anno.h"
#include "binding/instance.h"
#include "hosts/heap.h"
#include "store/index.h"
#include "store/store.h"
#include "store/table.h"
#include "styles/styles.h"

namespace {

struct ANSharedAnchor {
    ANPos anchor;    // itemId and subItemId name the anchor
    uint32_t units;  // the destination's units of text there before the copy
    uint16_t last;   // the destination's last text entry there
};

bool ANIsText(uint16_t type) { return type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER; }

uint32_t ANUnits(const ANEntry &entry) {
    return entry.type == AN_TYPE_TEXT ? entry.record.textLength : 1;
}

// The destination's units of text at the plain anchor of `at`, and its last text entry
// there; false when it has no text entry there.
bool ANTextAt(const ANEntryTable *table, const ANPos &at, ANSharedAnchor *shared) {
    uint16_t last = AN_NONE;
    uint64_t total = 0;
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        if (!ANIsText(entry.type) || !ANSameAnchor(entry.record.start, at)) continue;
        last = i;
        total += ANUnits(entry);
    }
    *shared = ANSharedAnchor{at, total > UINT32_MAX ? UINT32_MAX : uint32_t(total), last};
    return last != AN_NONE;
}

// The anchors with text in both tables, with the destination's units there, in the
// source's list order (an anchor's text entries are met together, those of its
// sibling (i, 0xFFFFFFFF) or (i, 0) interleaved with them). 13 when out of memory.
uint32_t ANFindSharedAnchors(const ANEntryTable *source, const ANEntryTable *dest,
                             ANSharedAnchor **shared, uint32_t *count) {
    *shared = nullptr;
    *count = 0;
    uint32_t texts = 0;
    for (uint16_t i = source->first; i != AN_NONE; i = ANSlot(source, i).next) {
        texts += ANIsText(ANSlot(source, i).type) ? 1 : 0;
    }
    if (texts == 0 || dest == nullptr) return AN_OK;
    *shared = ANHeapNew<ANSharedAnchor>(texts);
    if (*shared == nullptr) return AN_ERR_NOMEM;
    ANPos seen[2] = {};  // the last two anchors met
    uint32_t met = 0;
    for (uint16_t i = source->first; i != AN_NONE; i = ANSlot(source, i).next) {
        const ANEntry &entry = ANSlot(source, i);
        const ANPos &at = entry.record.start;
        if (!ANIsText(entry.type)) continue;
        if ((met > 0 && ANSameAnchor(at, seen[0])) || (met > 1 && ANSameAnchor(at, seen[1]))) {
            continue;
        }
        seen[1] = seen[0];
        seen[0] = at;
        ++met;
        if (ANTextAt(dest, at, &(*shared)[*count])) ++*count;
    }
    return AN_OK;
}

const ANSharedAnchor *ANSharedAt(const ANSharedAnchor *shared, uint32_t count, const ANPos &at) {
    for (uint32_t k = 0; k < count; ++k) {
        if (ANSameAnchor(shared[k].anchor, at)) return &shared[k];
    }
    return nullptr;
}

// The destination's last text entry at a shared anchor leaves the anchor's content
// position for the kind-5 position after its text, where ordered insertion would put
// it: behind the entries that start before that, and the text entries that start there.
void ANMoveLastText(ANEntryTable *table, const ANSharedAnchor &shared) {
    const uint16_t last = shared.last;
    if (ANSlot(table, last).record.start.kind == ANPOS_ANNOTEXT) return;
    ANEntry &entry = ANSlot(table, last);
    const ANPos start{shared.anchor.itemId, shared.anchor.subItemId, ANPOS_ANNOTEXT, shared.units};
    uint16_t after = entry.prev;
    ANListRemove(table, last);
    entry.record.start = start;
    entry.record.end = ANStepAfter(start);
    while (after != AN_NONE) {
        const ANEntry &other = ANSlot(table, after);
        const int16_t order = ANComparePos(other.record.start, start);
        if (order < 0 || (order == 0 && ANIsText(other.type))) break;
        after = other.prev;
    }
    ANListInsertAfter(table, last, after);
}

// A kind-5 position at a shared anchor, past the destination's units there (text
// indices stop at the greatest).
void ANRenumber(const ANSharedAnchor *shared, uint32_t count, ANPos *pos) {
    if (pos->kind != ANPOS_ANNOTEXT) return;
    const ANSharedAnchor *at = ANSharedAt(shared, count, *pos);
    if (at == nullptr) return;
    const uint64_t index = uint64_t{pos->textIndex} + at->units;
    pos->textIndex = index > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(index);
}

}  // namespace

extern "C" AN_API uint32_t ANCopyAnnos(DAHandle dest, DAHandle src) {
    ANInstance *source = nullptr;
    uint32_t rc = ANFindState(src, &source);
    if (rc != AN_OK) return rc;
    // Nothing to copy: the destination is not even looked at.
    if (source->entries == nullptr) return AN_OK;

    ANInstance *target = nullptr;
    rc = ANFindState(dest, &target);
    if (rc != AN_OK) return rc;
    // Onto itself the walk would meet the entries it inserts, and every annotation and
    // style is already there: the document stays as it is.
    if (target == source) return AN_OK;

    // Shared anchors are counted before anything moves. Without the memory for that,
    // nothing is copied.
    const ANEntryTable *table = source->entries;
    ANSharedAnchor *shared = nullptr;
    uint32_t count = 0;
    rc = ANFindSharedAnchors(table, target->entries, &shared, &count);
    if (rc != AN_OK) return rc;
    for (uint32_t k = 0; k < count; ++k) ANMoveLastText(target->entries, shared[k]);
    if (count != 0) ANIndexForget(target);

    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        // Insertion writes to the record it is given (a text's buffer is taken over
        // for the duration, its capacity recomputed); a copy keeps the source as it is.
        // The copy carries no ownership of userData: the source's caller gave the
        // block to the source, so the destination never frees it.
        ANAnnoRecord record = entry.record;
        ANRenumber(shared, count, &record.start);
        ANRenumber(shared, count, &record.end);
        // Renumbered apart, two sibling anchors' indices ((i, 0xFFFFFFFF) and (i, 0) sort
        // as one) can put an end before its start: the extent then closes at the start.
        if (ANPosBefore(record.end, record.start)) {
            const bool extent = entry.type == AN_TYPE_HILITE || entry.type == AN_TYPE_RANGE;
            record.end = extent ? record.start : ANStepAfter(record.start);
        }
        const bool apart =
            ANIsText(entry.type) && ANSharedAt(shared, count, entry.record.start) != nullptr;
        ANInsertEntry(target, entry.type, &record, apart ? ANINSERT_COPY_APART : ANINSERT_COPY, 0);
    }
    ANHeapFree(shared);

    if (source->styles == nullptr) return AN_OK;
    rc = ANFindState(dest, &target);
    if (rc != AN_OK) return rc;
    ANCopyStyleTable(target->styles, source->styles);
    return AN_OK;
}
