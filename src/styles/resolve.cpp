// Style resolution for tracking: palette words and style numbers.
#include "styles/resolve.h"

#include "binding/instance.h"
#include "store/table.h"
#include "styles/styles.h"

namespace {

void ANResolveDirectWord(uint32_t word, ANTrackInfo *track) {
    if ((word & ANSTYLEWORD_NOCOLOR2) != 0) {
        track->color2Set = 0;
    } else {
        track->color2Set = 1;
        track->color2 = ANPalette16[(word >> ANSTYLEWORD_COLOR2_SHIFT) & ANSTYLEWORD_INDEX_MASK];
    }
    if ((word & ANSTYLEWORD_NOCOLOR1) != 0) {
        track->color1Set = 0;
    } else {
        track->color1Set = 1;
        track->color1 = ANPalette16[(word >> ANSTYLEWORD_COLOR1_SHIFT) & ANSTYLEWORD_INDEX_MASK];
    }
}

// The document's own style first; the global table only when the document's own
// table exists and lacks the id.
const ANHiliteStyle *ANLookUpStyle(DAHandle doc, uint32_t styleId) {
    ANInstance *instance = nullptr;
    if (ANFindState(doc, &instance) != AN_OK || instance->styles == nullptr) return nullptr;
    const ANHiliteStyle *style = ANFindStyle(instance->styles, styleId);
    if (style == nullptr) style = ANFindStyle(instance->globalStyles, styleId);
    return style;
}

}  // namespace

uint32_t ANResolveStyle(DAHandle doc, const ANEntryTable *table, ANTrackInfo *track,
                        uint16_t entry) {
    const ANAnnoRecord &record = ANSlot(table, entry).record;
    const uint32_t word = record.style;
    track->attrSet = 0;
    track->userData = record.userData;

    if ((word & ANSTYLEWORD_NUMBER) == 0) {
        ANResolveDirectWord(word, track);
        return ANTRACK_BIT_HILITE;
    }

    const ANHiliteStyle *style = ANLookUpStyle(doc, word & ANSTYLEWORD_ID_MASK);
    if (style == nullptr) {
        track->color1Set = 0;
        track->color2Set = 0;
        track->attrSet = 0;
        return ANTRACK_BIT_HILITE;
    }
    // The colours and attributes are written whatever the flags say; the flags only
    // switch them on.
    track->color1 = style->color1;
    track->color2 = style->color2;
    track->attr1 = style->attr1;
    track->attr2 = style->attr2;
    if ((style->flags & ANSTYLE_COLOR1) != 0) track->color1Set = 1;
    if ((style->flags & ANSTYLE_COLOR2) != 0) track->color2Set = 1;
    if ((style->flags & ANSTYLE_ATTR) != 0) track->attrSet = 1;
    return ANTRACK_BIT_HILITE;
}
