// Clearing annotations by tag, with what removing annotation text entails: the text
// positions at its anchor are renumbered, annotations left with nothing to cover go,
// and two texts that a removed placeholder separated become one. Also freeing the
// userData blocks that callers handed over with their annotations.
#include <cstring>

#include "anno/anno.h"
#include "binding/instance.h"
#include "binding/module_lock.h"
#include "hosts/heap.h"
#include "hosts/modules.h"
#include "positions/order.h"
#include "store/index.h"
#include "store/store.h"
#include "store/table.h"

namespace {

constexpr uint32_t kTextStep = 64;  // text buffers grow by this many units
constexpr uint32_t kStatusOk = AN_OK;

// A clear walks the ordered list; `cursor` is the entry it goes on with. Releasing
// that entry as a side effect moves the cursor on to the entry that followed it.
struct ANClearWalk {
    ANInstance *instance;
    ANEntryTable *table;
    uint16_t cursor;
    uint16_t flags;  // the selection of the clear
    uint32_t value;
};

bool ANIsTextType(uint16_t type) { return type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER; }

bool ANIsRangeType(uint16_t type) {
    return type == AN_TYPE_HILITE || type == AN_TYPE_RANGE || type == AN_TYPE_CUTMARK;
}

// Units of annotation text an entry holds: its text for type 5, one for type 6.
uint32_t ANTextUnits(const ANEntry &entry) {
    if (entry.type == AN_TYPE_TEXT) return entry.record.textLength;
    return entry.type == AN_TYPE_PLACEHOLDER ? 1 : 0;
}

bool ANIsSelected(uint32_t tag, uint16_t flags, uint32_t value) {
    if (flags == 0) return (tag & ANTAG_PROTECTED) == 0;
    if ((flags & ANCLEAR_EQUAL) != 0) return tag == value;
    if ((flags & ANCLEAR_MASK) != 0) return (tag & value) == value;
    return false;
}

// Gives back the slot of an unlinked entry; a move event can no longer refer to it.
void ANGiveBack(ANClearWalk &walk, uint16_t index) {
    ANReleaseSlot(walk.table, index);
    // Removals renumber, join and reorder entries anywhere up to the anchor.
    ANIndexForget(walk.instance);
    if (walk.instance->hoverEntry == index) ANResetHover(walk.instance);
}

bool ANOwnsUserData(const ANEntry &entry) {
    const bool blockType =
        entry.type == AN_TYPE_HILITE || entry.type == AN_TYPE_RANGE || entry.type == AN_TYPE_TEXT;
    return blockType && (entry.flags & ANENTRY_OWNS_USERDATA) != 0 && entry.record.userData != 0;
}

// Releases an entry that a removal takes with it, without telling the callback.
void ANDropEntry(ANClearWalk &walk, uint16_t index) {
    ANEntry &entry = ANSlot(walk.table, index);
    if (walk.cursor == index) walk.cursor = entry.next;
    ANListRemove(walk.table, index);
    // Nobody hears of this entry again: the document keeps its block.
    if (ANOwnsUserData(entry)) {
        entry.flags = static_cast<uint16_t>(entry.flags & ~ANENTRY_OWNS_USERDATA);
        ANKeepOrphanBlock(walk.instance, entry.record.userData);
    }
    if (entry.type == AN_TYPE_TEXT) {
        ANHeapFree(entry.record.textBuffer);
        entry.record.textBuffer = nullptr;
    }
    ANGiveBack(walk, index);
}

// The text at an anchor loses `length` units from index `offset` on. Units behind them
// move down; a position on a removed unit goes to `collapse`.
struct ANTextCut {
    ANPos anchor;  // the removed entry's start: itemId and subItemId name the anchor
    uint32_t offset;
    uint32_t length;
    ANPos collapse;
    bool lastText;       // the removed entry was the last text at the anchor
    uint16_t neighbour;  // the nearest text entry before it, or AN_NONE
};

// Returns whether `pos` changed.
bool ANRenumberPos(ANPos &pos, const ANTextCut &cut) {
    if (pos.kind != ANPOS_ANNOTEXT || !ANSameAnchor(pos, cut.anchor)) return false;
    if (pos.textIndex < cut.offset) return false;
    const uint32_t past = pos.textIndex - cut.offset;
    // After the last text at the anchor nothing is left behind `offset`: also an
    // empty last entry hands its place to the text before it.
    if (past < cut.length || (past == 0 && cut.lastText)) {
        pos = cut.collapse;
    } else {
        pos.textIndex -= cut.length;
    }
    return true;
}

// Brings an entry back to a valid extent after the renumbering. A range (or cut
// marker) that covers nothing goes. A point keeps the one-step extent of its kind:
// with its end collapsed onto the anchor while its start stayed in the text, it
// would otherwise stretch over text inserted at the anchor later.
void ANRestoreExtent(ANClearWalk &walk, uint16_t index, bool moved) {
    ANEntry &entry = ANSlot(walk.table, index);
    const bool empty = ANComparePos(entry.record.start, entry.record.end) >= 0;
    if (ANIsRangeType(entry.type)) {
        if (empty) ANDropEntry(walk, index);
    } else if (empty || moved) {
        entry.record.end = ANStepAfter(entry.record.start);
    }
}

// Renumbers the positions of every entry listed up to the anchor, which covers every
// entry with a position in the anchor's text: entries on the item itself sort before
// text at one of its characters and must not end the walk.
void ANRenumber(ANClearWalk &walk, const ANTextCut &cut) {
    uint16_t index = walk.table->first;
    while (index != AN_NONE) {
        ANEntry &entry = ANSlot(walk.table, index);
        if (ANStartPastAnchor(entry.record.start, cut.anchor)) break;
        const uint16_t next = entry.next;
        // When the last text goes, the text entry nearest before it becomes the last.
        // Text entries before an empty one share its start and stay where they are.
        const ANPos &start = entry.record.start;
        const bool staysInText = cut.lastText && index != cut.neighbour &&
                                 ANIsTextType(entry.type) && start.kind == ANPOS_ANNOTEXT &&
                                 ANSameAnchor(start, cut.anchor) && start.textIndex == cut.offset;
        const bool startMoved = !staysInText && ANRenumberPos(entry.record.start, cut);
        const bool endMoved = ANRenumberPos(entry.record.end, cut);
        ANRestoreExtent(walk, index, startMoved || endMoved);
        index = next;
    }
}

// Appends the text of `after` to `before`, releases `after`, and gives `before` the
// place `after` had: its positions, and a list position behind the annotations that
// now lie inside its text. Out of memory leaves both texts as they are.
uint32_t ANJoinTexts(ANClearWalk &walk, uint16_t before, uint16_t after) {
    ANEntryTable *table = walk.table;
    ANAnnoRecord &kept = ANSlot(table, before).record;
    ANAnnoRecord &gone = ANSlot(table, after).record;
    const uint64_t total = uint64_t{kept.textLength} + gone.textLength;
    uint64_t capacity = kept.textCapacity;
    while (capacity <= total) capacity += kTextStep;
    if (capacity > UINT32_MAX) return AN_ERR_NOMEM;
    if (capacity != kept.textCapacity) {
        // One reallocation to the final size: a failure leaves the buffer untouched.
        void *grown = ANHeapReAlloc(kept.textBuffer, capacity * sizeof(uint16_t));
        if (grown == nullptr) return AN_ERR_NOMEM;
        kept.textBuffer = static_cast<uint16_t *>(grown);
        kept.textCapacity = static_cast<uint32_t>(capacity);
    }
    if (gone.textLength != 0) {
        std::memcpy(kept.textBuffer + kept.textLength, gone.textBuffer,
                    gone.textLength * sizeof(uint16_t));
    }
    kept.textLength = static_cast<uint32_t>(total);
    kept.start = gone.start;
    kept.end = gone.end;
    ANDropEntry(walk, after);

    // The annotations on the units that `before` took over now lie inside its text:
    // they, and any position left on the removed unit, go in front of it.
    uint16_t index = ANSlot(table, before).next;
    while (index != AN_NONE && ANPosBefore(ANSlot(table, index).record.start, kept.start)) {
        const uint16_t next = ANSlot(table, index).next;
        ANListRemove(table, index);
        ANListInsertAfter(table, index, ANSlot(table, before).prev);
        index = next;
    }
    return kStatusOk;
}

// Fixes the annotation text at the anchor of a removed (already unlinked) text entry.
// Returns 13 when the join of the texts around a placeholder ran out of memory.
uint32_t ANFixText(ANClearWalk &walk, uint16_t removed) {
    ANEntryTable *table = walk.table;
    const ANEntry &entry = ANSlot(table, removed);
    const ANPos anchor = entry.record.start;
    // The anchor's text spans the list from its first unit to its content position.
    // Entries of other anchors can lie in between (those on the item itself, when the
    // anchor is character 0 of a text item); only the anchor's own text counts.
    const ANPos textBegin{anchor.itemId, anchor.subItemId, ANPOS_ANNOTEXT, 0};
    const ANPos content{anchor.itemId, anchor.subItemId, 0, 0};

    uint32_t offset = 0;
    uint16_t neighbour = AN_NONE;
    for (uint16_t i = entry.prev;
         i != AN_NONE && !ANPosBefore(ANSlot(table, i).record.start, textBegin);
         i = ANSlot(table, i).prev) {
        const ANEntry &other = ANSlot(table, i);
        if (!ANIsTextType(other.type) || !ANSameAnchor(other.record.start, anchor)) continue;
        offset += ANTextUnits(other);
        if (neighbour == AN_NONE) neighbour = i;
    }
    // Only text (not a placeholder) right before the removed entry can take a join.
    const uint16_t before =
        neighbour != AN_NONE && ANSlot(table, neighbour).type == AN_TYPE_TEXT ? neighbour : AN_NONE;

    uint16_t after = AN_NONE;
    for (uint16_t i = entry.next;
         i != AN_NONE && ANPosAtOrBefore(ANSlot(table, i).record.start, content);
         i = ANSlot(table, i).next) {
        if (!ANSameAnchor(ANSlot(table, i).record.start, anchor)) continue;
        const uint16_t type = ANSlot(table, i).type;
        if (type == AN_TYPE_PLACEHOLDER) break;
        if (type == AN_TYPE_TEXT) {
            after = i;
            break;
        }
    }

    ANTextCut cut{anchor, offset, ANTextUnits(entry), {}, anchor.kind != ANPOS_ANNOTEXT, neighbour};
    if (anchor.kind == ANPOS_ANNOTEXT) {
        // Not the last text at the anchor: its units now begin where the removed ones did.
        cut.collapse = ANPos{anchor.itemId, anchor.subItemId, ANPOS_ANNOTEXT, offset};
    } else {
        cut.collapse = content;
    }
    ANRenumber(walk, cut);

    uint32_t status = kStatusOk;
    // A text that this clear selects and has not yet reached (one that restoring the
    // order moved behind its walk) is removed, and announced, in its turn: joined, the
    // text after would go with the one before, or outlive the clear under its tag.
    if (entry.type == AN_TYPE_PLACEHOLDER && before != AN_NONE && after != AN_NONE &&
        !ANIsSelected(ANSlot(table, before).record.tag, walk.flags, walk.value) &&
        !ANIsSelected(ANSlot(table, after).record.tag, walk.flags, walk.value)) {
        status = ANJoinTexts(walk, before, after);
    }
    // Positions collapsed onto a character's content position can pass entries on
    // the item itself, whose text at character 0 interleaves with the item's.
    ANRestoreOrder(table, anchor);
    return status;
}

// Removes a selected entry and announces it. Returns the new status of the clear.
uint32_t ANRemoveEntry(ANClearWalk &walk, uint16_t index, uint32_t status) {
    ANEntry &entry = ANSlot(walk.table, index);
    ANListRemove(walk.table, index);
    if (ANIsTextType(entry.type) && ANFixText(walk, index) != kStatusOk) status = AN_ERR_NOMEM;
    if (entry.type == AN_TYPE_TEXT) {
        ANHeapFree(entry.record.textBuffer);
        entry.record.textBuffer = nullptr;
    }
    ANGiveBack(walk, index);
    // The record stays readable in the free slot for the length of the call.
    if (walk.instance->callback != nullptr) {
        status = ANNotify(walk.instance, ANNOTIFY_REMOVED, entry.type, &entry.record);
    }
    return status;
}

// Frees every userData block an entry was given to own, once per block: later entries
// holding the same value lose it before it is freed.
void ANFreeUserDataBlocks(ANEntryTable *table) {
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        ANEntry &entry = ANSlot(table, i);
        if (!ANOwnsUserData(entry)) continue;
        const uint64_t block = entry.record.userData;
        for (uint16_t j = entry.next; j != AN_NONE; j = ANSlot(table, j).next) {
            ANEntry &other = ANSlot(table, j);
            if (other.record.userData != block) continue;
            other.record.userData = 0;
            other.flags = static_cast<uint16_t>(other.flags & ~ANENTRY_OWNS_USERDATA);
        }
        // NOLINTNEXTLINE(performance-no-int-to-ptr): userData holds the block
        ANHeapFree(reinterpret_cast<void *>(static_cast<uintptr_t>(block)));
        entry.record.userData = 0;
        entry.flags = static_cast<uint16_t>(entry.flags & ~ANENTRY_OWNS_USERDATA);
    }
}

}  // namespace

extern "C" AN_API uint32_t ANClearAnnos(DAHandle doc, uint16_t flags, uint32_t value) {
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    ANEntryTable *table = instance->entries;
    if (table == nullptr) return AN_OK;

    uint32_t status = kStatusOk;
    // Removing text renumbers positions, and restoring the list's order afterwards can
    // move an entry the walk has not reached in front of the ones it has; a selected
    // one is then removed by another pass. Each pass removes at least the first
    // selected entry of the list, so the passes end.
    bool again = true;
    while (again) {
        ANClearWalk walk{instance, table, table->first, flags, value};
        while (walk.cursor != AN_NONE) {
            const uint16_t index = walk.cursor;
            walk.cursor = ANSlot(table, index).next;
            if (ANIsSelected(ANSlot(table, index).record.tag, flags, value)) {
                status = ANRemoveEntry(walk, index, status);
            }
        }
        again = false;
        for (uint16_t i = table->first; i != AN_NONE && !again; i = ANSlot(table, i).next) {
            again = ANIsSelected(ANSlot(table, i).record.tag, flags, value);
        }
    }
    if (table->count == 0) {
        ANFreeTable(table);
        instance->entries = nullptr;
        ANFreeIndex(instance);
    }
    return status;
}

extern "C" AN_API uint32_t ANClearUserData(DAHandle doc) {
    if (doc == nullptr) return AN_ERR_BADARG;
    DARetrievedDoc retrieved = nullptr;
    const uint32_t rc = DARetrieveDocHandle(doc, &retrieved);
    if (rc != 0) return rc;
    ANModuleDataLock lock(retrieved);
    void **slots = lock.slots();
    if (slots == nullptr) return AN_OK;
    auto *instance = static_cast<ANInstance *>(slots[ANMOD_SLOT_ANNO]);
    if (instance == nullptr) return AN_OK;
    ANFreeOrphanBlocks(instance);  // first: those an entry owns go with the entries'
    if (instance->entries != nullptr) ANFreeUserDataBlocks(instance->entries);
    return AN_OK;
}
