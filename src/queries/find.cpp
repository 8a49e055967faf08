// Finding one annotation by tag and position along the ordered list.
#include "anno/anno.h"
#include "binding/instance.h"
#include "positions/order.h"
#include "store/table.h"

namespace {

constexpr uint32_t ANFIND_KIND_LAST = ANFIND_AT;

// Tags of 0 or with bit 31 set switch the rejection rules of kinds 3 and 4.
bool ANSpecialTag(uint32_t tag) { return tag == 0 || (tag & ANTAG_PROTECTED) != 0; }

bool ANPassesTag(const ANFindRecord &find, const ANEntry &entry) {
    if ((find.mode & ANFIND_MASK) != 0) return (entry.record.tag & find.tag) == find.tag;
    if ((find.mode & ANFIND_EQUAL) != 0) return entry.record.tag == find.tag;
    return false;
}

// Kind 3: end entries that the key names, or whose end is on an item itself.
bool ANRejectedByKeyAnchor(const ANFindRecord &find, const ANEntry &entry) {
    const ANPos &end = entry.record.end;
    if (ANSpecialTag(find.tag)) {
        return end.kind == find.key.itemId && end.textIndex == find.key.subItemId;
    }
    return end.kind != ANPOS_NOSUBITEM && end.subItemId == ANPOS_NOSUBITEM;
}

// Kind 4: entries that end on an item itself.
bool ANRejectedByTextEnd(const ANFindRecord &find, const ANEntry &entry) {
    if (ANSpecialTag(find.tag)) return false;
    return entry.record.end.subItemId == ANPOS_NOSUBITEM;
}

// Whether `entry` is where a walk of `kind` may start testing tags.
bool ANIsCandidate(const ANFindRecord &find, uint32_t kind, bool afterPrevious,
                   const ANEntry &entry) {
    const ANAnnoRecord &r = entry.record;
    switch (kind) {
        case ANFIND_BEFORE:
            return ANPosAtOrBefore(r.end, find.key) && !ANRejectedByKeyAnchor(find, entry);
        case ANFIND_AFTER:
            return ANPosBefore(find.key, r.start) &&
                   (!afterPrevious || ANPosBefore(find.foundEnd, r.start)) &&
                   !ANRejectedByTextEnd(find, entry);
        case ANFIND_FROM:
            return ANPosAtOrBefore(find.key, r.start);
        default:  // first and last: every entry
            return true;
    }
}

uint16_t ANFindCovering(const ANEntryTable *table, const ANFindRecord &find) {
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        if (ANPosBefore(find.key, entry.record.start)) break;
        if (ANPosBefore(find.key, entry.record.end) && ANPassesTag(find, entry)) return i;
    }
    return AN_NONE;
}

uint16_t ANFindWalking(const ANEntryTable *table, const ANFindRecord &find, uint32_t kind,
                       bool afterPrevious) {
    const bool backward = kind == ANFIND_LAST || kind == ANFIND_BEFORE;
    bool candidateMet = false;
    for (uint16_t i = backward ? table->last : table->first; i != AN_NONE;) {
        const ANEntry &entry = ANSlot(table, i);
        // Once the candidate is met, only the tag test applies.
        if (!candidateMet) candidateMet = ANIsCandidate(find, kind, afterPrevious, entry);
        if (candidateMet && ANPassesTag(find, entry)) return i;
        i = backward ? entry.prev : entry.next;
    }
    return AN_NONE;
}

// The first position of the text of a type-5 or type-6 entry: its start less its
// units inside the text, or, for the last text at its anchor (whose start is the
// anchor's content position), the units at the anchor counted by walking them.
// A failure to read the document on the way is returned, and `first` is not written.
uint32_t ANTextEntryStart(DAHandle doc, const ANEntry &entry, ANPos *first) {
    const ANPos &start = entry.record.start;
    const uint32_t units = entry.type == AN_TYPE_TEXT ? entry.record.textLength : 1;
    *first = ANPos{start.itemId, start.subItemId, ANPOS_ANNOTEXT, start.textIndex - units};
    if (start.kind == ANPOS_ANNOTEXT) return AN_OK;
    ANPos at{start.itemId, start.subItemId, ANPOS_ANNOTEXT, 0};
    uint32_t steps = 0;
    for (;;) {
        // Only the text step moves within the anchor's text; where it gives nothing
        // more there, the walk would go on to the anchor's content. A failure to find
        // the state on the way would cut the count short, so it is returned instead.
        ANPos following{};
        const uint32_t rc = ANNextAnnoTextPos(doc, &at, &following);
        ++steps;
        if (rc != AN_OK && rc != AN_ERR_NOTFOUND) return rc;
        if (rc != AN_OK || !ANSameAnchor(following, at) || !ANPosBefore(at, following)) break;
        at = following;
    }
    first->textIndex = steps - units;
    return AN_OK;
}

}  // namespace

extern "C" AN_API uint32_t ANFindAnno(DAHandle doc, uint16_t flags, ANFindRecord *find) {
    if (doc == nullptr || find == nullptr || find->size != ANFINDRECORD_SIZE) {
        return AN_ERR_BADARG;
    }
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    const ANEntryTable *table = instance->entries;
    const uint32_t kind = find->mode & ANFIND_KINDMASK;
    if (table == nullptr || kind < ANFIND_FIRST || kind > ANFIND_KIND_LAST) {
        return AN_ERR_NOTFOUND;
    }

    const bool afterPrevious = (flags & ANFIND_AFTER_PREVIOUS) != 0;
    const uint16_t found = kind == ANFIND_AT ? ANFindCovering(table, *find)
                                             : ANFindWalking(table, *find, kind, afterPrevious);
    if (found == AN_NONE) return AN_ERR_NOTFOUND;

    const ANEntry &entry = ANSlot(table, found);
    if (entry.type == AN_TYPE_TEXT || entry.type == AN_TYPE_PLACEHOLDER) {
        ANPos first{};
        const uint32_t failed = ANTextEntryStart(doc, entry, &first);
        if (failed != AN_OK) return failed;
        find->foundStart = first;
        find->foundEnd = entry.record.start;
    } else {
        find->foundStart = entry.record.start;
        find->foundEnd = entry.record.end;
    }
    find->foundTag = entry.record.tag;
    find->foundUserData = entry.record.userData;
    return AN_OK;
}
