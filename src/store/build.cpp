// Building styled highlights from the ranges a document defines itself (the
// chunker's document ranges), incrementally: each range is examined once.
#include "anno/anno.h"
#include "binding/instance.h"
#include "hosts/modules.h"
#include "store/store.h"

namespace {

// What a built range becomes, by its range code.
struct ANRangeKind {
    uint32_t code;
    uint32_t tagBits;  // OR-ed with the range number
    uint32_t eventMask;
    uint32_t style;
};

constexpr uint32_t ANRANGE_LINK = 0x8003000C;
constexpr uint32_t ANRANGE_MARKED_END = 0x80020008;  // its end also names the next item
constexpr uint32_t ANRANGE_FIELD = 0x84000010;
constexpr uint32_t ANRANGE_PLAIN = 0x81000000;
constexpr uint32_t ANRANGE_UNCOLORED = 0x82000000;

constexpr uint32_t ANSTYLE_NUMBERED = ANSTYLEWORD_NUMBER;
constexpr uint32_t ANSTYLE_NO_COLORS = ANSTYLEWORD_NOCOLOR1 | ANSTYLEWORD_NOCOLOR2;
constexpr uint32_t ANEVENTS_ENTER_LEAVE = ANEVENT_ENTER | ANEVENT_LEAVE;
constexpr uint32_t ANEVENTS_ALL = ANEVENT_CLICK1 | ANEVENT_CLICK2 | ANEVENTS_ENTER_LEAVE;
constexpr uint32_t ANEVENTS_NONE = 0;
static_assert(ANEVENTS_ALL == 15 && ANEVENTS_ENTER_LEAVE == 12, "event masks of built ranges");

constexpr ANRangeKind ANRANGE_KINDS[] = {
    {ANRANGE_LINK, 0x80200000, ANEVENTS_ALL, ANSTYLE_NUMBERED | 0x1002},
    {ANRANGE_MARKED_END, 0x80100000, ANEVENTS_ALL, ANSTYLE_NUMBERED | 0x1004},
    {ANRANGE_FIELD, 0x84000000, ANEVENTS_ALL, ANSTYLE_NUMBERED | 0x1001},
    {ANRANGE_PLAIN, 0x81000000, ANEVENTS_NONE, ANSTYLE_NUMBERED | 0x1000},
    {ANRANGE_UNCOLORED, 0x82000000, ANEVENTS_ENTER_LEAVE, ANSTYLE_NO_COLORS},
};

constexpr uint32_t ANID_NONE = 0xFFFFFFFF;  // "none" for an item or character id

const ANRangeKind *ANFindRangeKind(uint32_t code) {
    for (const ANRangeKind &kind : ANRANGE_KINDS) {
        if (kind.code == code) return &kind;
    }
    return nullptr;
}

// Walks the items from `first` to the end item of a range with `code` (type 68,
// field 2 = code) and gives the id of the item after it. False when any read fails,
// or when the chunker hands back an id that does not come after the one just read:
// item ids grow in document order, so that ends any walk that would go round.
bool ANFindRangeEnd(CHHandle chunker, uint32_t first, uint32_t code, uint32_t *after) {
    uint32_t id = first;
    for (;;) {
        CHItemInfo info{};
        uint32_t next = ANID_NONE;
        if (CHGetItem(chunker, ANMOD_CLASS_ITEM, id, &info, &next) != 0) return false;
        if (info.field1 == ANMOD_ITEM_RANGE_END && info.field2 == code) {
            *after = next;
            return true;
        }
        if (next <= id) return false;
        id = next;
    }
}

// Examines range number `index` and adds its highlight when it is one of the built
// kinds and its end item is found; any other outcome passes it over.
void ANBuildRange(DAHandle doc, CHHandle chunker, uint32_t index) {
    uint32_t rangeId = 0;
    if (CHGetItemId(chunker, ANMOD_CLASS_RANGE, index, &rangeId) != 0) return;
    CHItemInfo range{};
    if (CHGetItem(chunker, ANMOD_CLASS_RANGE, rangeId, &range, nullptr) != 0) return;
    const uint32_t first = range.field1;
    const uint32_t code = range.field2;
    const ANRangeKind *kind = ANFindRangeKind(code);
    if (kind == nullptr) return;
    uint32_t after = 0;
    if (!ANFindRangeEnd(chunker, first, code, &after)) return;

    ANAnnoRecord record{};
    record.size = AN_RECORD_SIZE_POINT;
    record.tag = index | kind->tagBits;
    record.eventMask = kind->eventMask;
    record.style = kind->style;
    record.start = ANPos{first, ANPOS_NOSUBITEM, 0, 0};
    record.end = ANPos{after, ANPOS_NOSUBITEM, 0, 0};
    // The item id is a plain value, not a block: the entry is added without
    // ownership of its userData, so nothing ever frees it.
    record.userData = first;
    if (code == ANRANGE_MARKED_END) {
        record.end.kind = after;
        CHItemInfo next{};
        const bool text = CHGetItem(chunker, ANMOD_CLASS_ITEM, after, &next, nullptr) == 0 &&
                          next.field1 == ANMOD_ITEM_TEXT;
        record.end.textIndex = text ? next.field2 : ANID_NONE;
    }
    ANAddRecord(doc, AN_TYPE_HILITE, &record, 0, 0);
}

}  // namespace

extern "C" AN_API uint32_t ANBuildAnnos(DAHandle doc) {
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;

    // Without a count nothing is examined and the cursor stays, so a later call
    // starts from the same range.
    uint32_t count = 0;
    if (CHGetItemCount(instance->chunker, ANMOD_CLASS_RANGE, &count) != 0) return AN_OK;

    while (instance->buildCursor < count) {
        // The cursor moves on before the range is examined: whatever becomes of it,
        // it is never examined again.
        const uint32_t index = instance->buildCursor++;
        ANBuildRange(doc, instance->chunker, index);
    }
    return AN_OK;
}
