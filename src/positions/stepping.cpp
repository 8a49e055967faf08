// Stepping through a document: content positions from the chunker, positions of the
// annotation text hanging at anchors, and the merged walk of both in position order.
#include "anno/anno.h"
#include "binding/instance.h"
#include "hosts/modules.h"
#include "positions/order.h"
#include "store/table.h"

namespace {

// The characters of a text item, as the chunker describes them.
struct ANItemChars {
    bool text;       // a text item with at least one character
    uint32_t first;  // first character id
    uint32_t last;   // last character id
};

ANItemChars ANCharsOf(const CHItemInfo &info) {
    ANItemChars chars{false, 0, 0};
    if (info.field1 != ANMOD_ITEM_TEXT || info.field3 == 0) return chars;
    chars.text = true;
    chars.first = info.field2;
    chars.last = info.field2 + info.field3 - 1;
    return chars;
}

bool ANIsTextEntry(const ANEntry &entry) {
    return entry.type == AN_TYPE_TEXT || entry.type == AN_TYPE_PLACEHOLDER;
}

uint32_t ANTextUnits(const ANEntry &entry) {
    return entry.type == AN_TYPE_TEXT ? entry.record.textLength : 1;
}

}  // namespace

extern "C" AN_API uint32_t ANNextChunkerPos(DAHandle doc, const ANPos *pos, ANPos *next) {
    if (pos == nullptr || next == nullptr) return AN_ERR_BADARG;
    const ANPos p = *pos;  // `pos` and `next` may be one record
    *next = ANPos{};
    if (p.kind == ANPOS_ANNOTEXT) {
        next->itemId = p.itemId;
        next->subItemId = p.subItemId;
        return AN_OK;
    }
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    CHHandle chunker = instance->chunker;

    CHItemInfo info{};
    if (CHGetItem(chunker, ANMOD_CLASS_ITEM, p.itemId, &info, nullptr) != 0) {
        return AN_ERR_NOTFOUND;
    }
    const ANItemChars chars = ANCharsOf(info);
    if (chars.text) {
        const uint32_t s = p.subItemId == ANPOS_NOSUBITEM ? chars.first : p.subItemId;
        // A sub-item that is not one of the item's characters is not stepped from by
        // character, which would wander through other items' characters: one that
        // sorts before them goes to the first character, one after them ends the item.
        if (s < chars.first) {
            next->itemId = p.itemId;
            next->subItemId = chars.first;
            return AN_OK;
        }
        if (s < chars.last) {
            uint32_t following = 0;
            // A failed step, or one that does not move on inside the item, would
            // make the walk turn in place.
            if (CHNextItemId(chunker, ANMOD_CLASS_CHAR, s, &following) != 0 || following <= s ||
                following > chars.last) {
                return AN_ERR_NOTFOUND;
            }
            next->itemId = p.itemId;
            next->subItemId = following;
            return AN_OK;
        }
    }

    uint32_t item = 0;
    if (CHNextItemId(chunker, ANMOD_CLASS_ITEM, p.itemId, &item) != 0) return AN_ERR_NOTFOUND;
    next->itemId = item;
    next->subItemId = ANPOS_NOSUBITEM;
    CHItemInfo nextInfo{};
    if (CHGetItem(chunker, ANMOD_CLASS_ITEM, item, &nextInfo, nullptr) == 0) {
        const ANItemChars nextChars = ANCharsOf(nextInfo);
        if (nextChars.text) next->subItemId = nextChars.first;
    }
    return AN_OK;
}

extern "C" AN_API uint32_t ANNextAnnoTextPos(DAHandle doc, const ANPos *pos, ANPos *next) {
    if (pos == nullptr || next == nullptr) return AN_ERR_BADARG;
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    const ANEntryTable *table = instance->entries;
    if (table == nullptr || table->hasText == 0 || table->first == AN_NONE) {
        return AN_ERR_NOTFOUND;
    }

    const ANPos p = *pos;
    const bool inText = p.kind == ANPOS_ANNOTEXT;
    uint32_t count = 0;
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        if (!ANIsTextEntry(entry)) continue;
        const ANPos &s = entry.record.start;
        if (inText && ANSameAnchor(s, p)) {
            count += ANTextUnits(entry);
            if (count >= 1 && p.textIndex < count - 1) {
                *next = p;
                next->textIndex++;
                return AN_OK;
            }
            continue;
        }
        // The next anchor is the first whose text begins after P in the one order;
        // comparing subItemId as a plain number would offer text at (i, 0xFFFFFFFF)
        // again from every character of i, behind the walk.
        const ANPos textStart{s.itemId, s.subItemId, ANPOS_ANNOTEXT, 0};
        if (ANPosBefore(p, textStart)) {
            *next = textStart;
            return AN_OK;
        }
    }
    return AN_ERR_NOTFOUND;
}

extern "C" AN_API uint32_t ANNextPos(DAHandle doc, const ANPos *pos, ANPos *next) {
    if (pos == nullptr || next == nullptr) return AN_ERR_NOTFOUND;
    const ANPos p = *pos;
    ANPos text{};
    const bool haveText = ANNextAnnoTextPos(doc, &p, &text) == AN_OK && ANPosBefore(p, text);
    if (haveText && p.kind == ANPOS_ANNOTEXT && ANSameAnchor(text, p)) {
        *next = text;
        return AN_OK;
    }
    ANPos content{};
    if (ANNextChunkerPos(doc, &p, &content) != AN_OK) return AN_ERR_NOTFOUND;
    const ANPos chosen = haveText && ANPosBefore(text, content) ? text : content;
    // Whatever the chunker says, a walk never turns back or stands still.
    if (!ANPosBefore(p, chosen)) return AN_ERR_NOTFOUND;
    *next = chosen;
    return AN_OK;
}
