// Cutting a trimmed range into pieces: a walk from its start towards its end that
// ends a piece before every cut position, puts a cut marker on the cut unless one is
// there, and leaves what follows the last cut for ANAddRecord to insert.
#include <cstring>

#include "hosts/modules.h"
#include "positions/order.h"
#include "ranges/split.h"
#include "ranges/walk.h"
#include "store/store.h"

namespace {

constexpr uint32_t kPlaceholderUnit = 6;  // ANGetAnnoText: the unit of a type-6 entry

// How one pass of the walk leaves it.
enum class ANPass { Next, Tail, HandBack, Failed };

// The working state of one cutting walk.
struct ANCutWalk {
    DAHandle doc;
    ANInstance *instance;
    const ANAnnoRecord *entry;  // the caller's tag and userData, and the range's end
    uint16_t entryFlags;
    ANTrackInfo track;    // watches existing cut markers along the range
    uint32_t trackState;  // what starting the track gave
    ANAnnoTextTrack text;
    ANPos s;  // start of the current piece
    ANPos x;  // position being examined
    uint32_t failure;
};

bool ANInRange(const ANCutWalk &walk, const ANPos &pos) {
    return ANPosInRange(walk.instance, &pos) != 0;
}

// A content position on an item of type 0 with field 2 equal to 1, or the one unit
// of a placeholder in annotation text. Any failure to tell means no cut.
bool ANIsCutPos(ANCutWalk &walk, const ANPos &pos) {
    if (pos.kind == ANPOS_ANNOTEXT) {
        uint16_t unit = 0;
        return ANGetAnnoText(walk.doc, &walk.text, &pos, &unit) == kPlaceholderUnit;
    }
    CHItemInfo info{};
    return CHGetItem(walk.instance->chunker, ANMOD_CLASS_ITEM, pos.itemId, &info, nullptr) == 0 &&
           info.field1 == ANMOD_ITEM_CUT_TYPE && info.field2 == ANMOD_ITEM_CUT_FIELD;
}

// Whether tracking shows a cut marker already covering `pos`.
bool ANMarkedAt(ANCutWalk &walk, const ANPos &pos) {
    if (walk.trackState != ANTRACK_ACTIVE) return false;
    if ((ANTrackAnno(walk.doc, &pos, &walk.track) & ANTRACK_BIT_CUTMARK) == 0) return false;
    return walk.track.markActive != 0;
}

// Adds a piece (type 3) or a marker (type 7) quietly; the caller's annotation is
// announced once, by ANAddRecord, when the whole range is in.
uint32_t ANAddPart(const ANCutWalk &walk, uint16_t type, const ANPos &start, const ANPos &end,
                   uint16_t entryFlags) {
    ANAnnoRecord add;
    std::memset(&add, 0, sizeof(add));
    add.size = AN_RECORD_SIZE_SHORT;
    add.tag = walk.entry->tag;
    add.userData = walk.entry->userData;
    add.start = start;
    add.end = end;
    return ANAddRecord(walk.doc, type, &add, 1, entryFlags);
}

// One pass: passes over existing ranges and skipped items, tests the position it
// reaches, and at a cut adds the piece before it and its marker. A step that fails
// ends the walk as if its end were reached.
ANPass ANCutPass(ANCutWalk &walk) {
    const ANPos &end = walk.entry->end;
    while (ANInRange(walk, walk.x) && !ANPosBefore(end, walk.x)) {
        if (!ANStepRangePos(walk.doc, &walk.x)) return ANPass::Tail;
    }
    const ANPos pieceEnd = walk.x;
    while (ANIsSkippedPos(walk.instance, walk.x)) {
        if (!ANStepRangePos(walk.doc, &walk.x)) return ANPass::Tail;
    }
    if (!ANPosBefore(walk.x, end)) return ANPass::HandBack;

    ANPos next = walk.x;
    if (!ANStepRangePos(walk.doc, &next)) return ANPass::Tail;
    const bool cut = ANIsCutPos(walk, walk.x);
    const bool marked = ANMarkedAt(walk, walk.x);
    if (!cut) {
        walk.x = next;
        return ANPass::Next;
    }

    while (ANInRange(walk, walk.s) && ANPosBefore(walk.s, walk.x)) {
        if (!ANStepRangePos(walk.doc, &walk.s)) break;
    }
    if (ANPosBefore(walk.s, walk.x)) {
        walk.failure = ANAddPart(walk, AN_TYPE_RANGE, walk.s, pieceEnd, walk.entryFlags);
        if (walk.failure != AN_OK) return ANPass::Failed;
    }
    if (!marked) {
        walk.failure = ANAddPart(walk, AN_TYPE_CUTMARK, walk.x, walk.x, 0);
        if (walk.failure != AN_OK) return ANPass::Failed;
    }
    walk.s = next;
    walk.x = next;
    return ANPass::Next;
}

// After the last cut: the last piece begins past skipped items and past positions a
// range or a marker covers.
void ANSettleTail(ANCutWalk &walk) {
    const ANPos &end = walk.entry->end;
    while (ANIsSkippedPos(walk.instance, walk.s)) {
        if (!ANStepRangePos(walk.doc, &walk.s)) return;
    }
    while (ANPosInRangeOrMark(walk.instance, &walk.s) != 0 && ANPosBefore(walk.s, end)) {
        if (!ANStepRangePos(walk.doc, &walk.s)) return;
    }
}

}  // namespace

uint32_t ANCutRangeAnno(DAHandle doc, ANInstance *instance, ANAnnoRecord *entry,
                        uint32_t *insertLast, uint16_t entryFlags) {
    ANCutWalk walk;
    std::memset(&walk, 0, sizeof(walk));
    walk.doc = doc;
    walk.instance = instance;
    walk.entry = entry;
    walk.entryFlags = entryFlags;
    walk.s = entry->start;
    walk.x = entry->start;
    walk.trackState = ANStartAnnoTrack(doc, &entry->start, &walk.track);
    if (ANStartAnnoTextTrack(doc, &walk.text) != AN_OK) return AN_ERR_NOMEM;

    ANPass pass = ANPass::Tail;
    while (ANPosBefore(walk.x, entry->end)) {
        pass = ANCutPass(walk);
        if (pass != ANPass::Next) break;
        pass = ANPass::Tail;
    }
    if (pass == ANPass::Failed) {
        ANEndAnnoTextTrack(doc, &walk.text);
        return walk.failure;
    }
    if (pass == ANPass::Tail) ANSettleTail(walk);

    if (ANPosBefore(walk.s, entry->end)) {
        entry->start = walk.s;
        *insertLast = 1;
    }
    ANEndAnnoTextTrack(doc, &walk.text);
    return AN_OK;
}
