// A range left empty at the start of an anchor's annotation text stays in order when
// more text goes in at that index (found by the fuzz target).
#include <gtest/gtest.h>

#include <vector>

#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;

class EmptyRangeTextTest : public annotest::LeakCheckedTest {};

TEST_F(EmptyRangeTextTest, AnEmptyHighlightAtATextIndexStaysOrderedWhenTextGoesInThere) {
    Doc doc(annotest::PlainDocument(3));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    // From the first text index of item 0 to the item itself: when the first unit
    // of text arrives at the item, the range's end moves to where that text begins,
    // which is its start, and the range is empty.
    ASSERT_EQ(annotest::AddHilite(doc, TextPos(0, ANPOS_NOSUBITEM, 0), Pos(0)), AN_OK);
    ASSERT_EQ(annotest::AddPlaceholder(doc, Pos(0)), AN_OK);
    ASSERT_TRUE(annotest::TableInvariantsHold(doc));
    // More text at index 0 moves the range's start on; its end must follow.
    ASSERT_EQ(annotest::AddPlaceholder(doc, TextPos(0, ANPOS_NOSUBITEM, 0)), AN_OK);
    EXPECT_TRUE(annotest::TableInvariantsHold(doc));
    for (const annotest::Listed &e : annotest::ListedEntries(doc)) {
        if (e.type != AN_TYPE_HILITE) continue;
        EXPECT_EQ(ANCompPos(&e.record.start, &e.record.end), 0) << "the range stays empty";
    }
}

TEST_F(EmptyRangeTextTest, ANonEmptyRangeInTextStillGrowsWithTextInsertedInside) {
    Doc doc(annotest::PlainDocument(3));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(1), u"abcd"), AN_OK);
    ASSERT_EQ(
        annotest::AddHilite(doc, TextPos(1, ANPOS_NOSUBITEM, 1), TextPos(1, ANPOS_NOSUBITEM, 3)),
        AN_OK);
    ASSERT_EQ(annotest::AddText(doc, TextPos(1, ANPOS_NOSUBITEM, 2), u"xy"), AN_OK);
    EXPECT_TRUE(annotest::TableInvariantsHold(doc));
    for (const annotest::Listed &e : annotest::ListedEntries(doc)) {
        if (e.type != AN_TYPE_HILITE) continue;
        EXPECT_EQ(e.record.start.textIndex, 1u);
        EXPECT_EQ(e.record.end.textIndex, 5u);
    }
}

}  // namespace
