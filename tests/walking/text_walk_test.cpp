// Walking a document with its annotation text: text before the content at each
// anchor, several entries and placeholders at one anchor, and text hung on a text
// item itself or on a character id that is not the item's, which must not make a
// walk turn back.
#include <gtest/gtest.h>

#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"
#include "walking/walk_support.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;
using walktest::ExpectedContent;
using walktest::StrictlyAscending;
using walktest::Walk;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;

class TextWalkTest : public annotest::LeakCheckedTest {};

// A plain item, two text items and a plain item, split over two chunks.
struct Layout {
    uint32_t plain;   // chunk 0
    uint32_t first;   // "abc": characters 0, 1, 2
    uint32_t second;  // "de": characters 3, 4
    uint32_t last;    // chunk 1
};

DAHandle LayoutDocument(Layout *layout) {
    antk::DocumentBuilder builder;
    layout->plain = builder.item(antk::kItemParagraph);
    layout->first = builder.textItem("abc");
    layout->second = builder.textItem("de");
    builder.newChunk();
    layout->last = builder.item(antk::kItemParagraph);
    return builder.build();
}

TEST_F(TextWalkTest, TextOfSeveralEntriesAndPlaceholdersComesBeforeItsAnchor) {
    Layout l{};
    Doc doc(LayoutDocument(&l));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const ANPos anchor = Pos(l.last);
    ASSERT_EQ(annotest::AddText(doc, anchor, u"xyz"), AN_OK);
    ASSERT_EQ(annotest::AddPlaceholder(doc, anchor), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, anchor, u"uv"), AN_OK);
    const ANPos character = Pos(l.first, 1);
    ASSERT_EQ(annotest::AddText(doc, character, u"q"), AN_OK);
    ASSERT_TRUE(TableInvariantsHold(doc));

    const std::vector<ANPos> expected{Pos(l.plain),
                                      Pos(l.first, 0),
                                      TextPos(l.first, 1, 0),
                                      Pos(l.first, 1),
                                      Pos(l.first, 2),
                                      Pos(l.second, 3),
                                      Pos(l.second, 4),
                                      TextPos(l.last, kNo, 0),
                                      TextPos(l.last, kNo, 1),
                                      TextPos(l.last, kNo, 2),
                                      TextPos(l.last, kNo, 3),
                                      TextPos(l.last, kNo, 4),
                                      TextPos(l.last, kNo, 5),
                                      Pos(l.last)};
    uint32_t end = 0;
    EXPECT_EQ(Walk(doc, Pos(l.plain), ANNextPos, &end), expected);
    EXPECT_EQ(end, AN_ERR_NOTFOUND);
    EXPECT_EQ(Walk(doc, Pos(l.plain), ANNextChunkerPos), ExpectedContent(doc))
        << "the content walk knows nothing of annotation text";

    // The text step alone: from content to the next anchor's text, through it, then none.
    EXPECT_EQ(Walk(doc, Pos(l.first, 2), ANNextAnnoTextPos),
              (std::vector<ANPos>{Pos(l.first, 2), TextPos(l.last, kNo, 0), TextPos(l.last, kNo, 1),
                                  TextPos(l.last, kNo, 2), TextPos(l.last, kNo, 3),
                                  TextPos(l.last, kNo, 4), TextPos(l.last, kNo, 5)}));
}

TEST_F(TextWalkTest, AnEmptyTextIsOnePositionThatTheNextStepLeaves) {
    Layout l{};
    Doc doc(LayoutDocument(&l));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.second, 4), u""), AN_OK);
    const std::vector<ANPos> walk = Walk(doc, Pos(l.second, 3), ANNextPos);
    EXPECT_EQ(walk, (std::vector<ANPos>{Pos(l.second, 3), TextPos(l.second, 4, 0), Pos(l.second, 4),
                                        Pos(l.last)}));
}

TEST_F(TextWalkTest, AnnotationsOfOtherTypesMakeNoTextPositions) {
    Layout l{};
    Doc doc(LayoutDocument(&l));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(annotest::AddHilite(doc, Pos(l.plain), Pos(l.second, 4)), AN_OK);
    ASSERT_EQ(annotest::AddPoint(doc, Pos(l.first, 1)), AN_OK);
    ASSERT_EQ(annotest::AddPoint(doc, Pos(l.second), 1, 0, AN_TYPE_VALUE), AN_OK);
    ASSERT_EQ(annotest::AddCutMark(doc, Pos(l.last)), AN_OK);
    ANPos next{};
    EXPECT_EQ(ANNextAnnoTextPos(doc, &ExpectedContent(doc).front(), &next), AN_ERR_NOTFOUND);
    EXPECT_EQ(Walk(doc, Pos(l.plain), ANNextPos), ExpectedContent(doc));
}

// Text hung on a text item itself (0xFFFFFFFF) sorts before every character of the
// item; offering it again from a character would send the walk back, for ever.
TEST_F(TextWalkTest, TextOnATextItemItselfIsVisitedOnceAndTheWalkEnds) {
    Layout l{};
    Doc doc(LayoutDocument(&l));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.first, kNo), u"A"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.second, kNo), u"C"), AN_OK);

    const std::vector<ANPos> walk = Walk(doc, Pos(l.plain), ANNextPos);
    EXPECT_TRUE(StrictlyAscending(walk));
    // The item itself stands for its first character, as the content walk has it.
    EXPECT_EQ(walk, (std::vector<ANPos>{Pos(l.plain), TextPos(l.first, kNo, 0), Pos(l.first, kNo),
                                        Pos(l.first, 1), Pos(l.first, 2), TextPos(l.second, kNo, 0),
                                        Pos(l.second, kNo), Pos(l.second, 4), Pos(l.last)}));

    // From a character, the item's text lies behind: it is not the next anchor.
    ANPos next{};
    const ANPos character = Pos(l.first, 1);
    ASSERT_EQ(ANNextAnnoTextPos(doc, &character, &next), AN_OK);
    EXPECT_EQ(next, TextPos(l.second, kNo, 0));
}

// Character id 0 belongs to the first text item only; on the second it names none of
// its characters, and the walk goes on to the item's first character.
TEST_F(TextWalkTest, TextOnCharacterZeroOfTextItemsKeepsTheWalkGoingForward) {
    Layout l{};
    Doc doc(LayoutDocument(&l));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.first, 0), u"B"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.second, 0), u"D"), AN_OK);
    const std::vector<ANPos> walk = Walk(doc, Pos(l.plain), ANNextPos);
    EXPECT_TRUE(StrictlyAscending(walk));
    EXPECT_EQ(walk, (std::vector<ANPos>{Pos(l.plain), TextPos(l.first, 0, 0), Pos(l.first, 0),
                                        Pos(l.first, 1), Pos(l.first, 2), TextPos(l.second, 0, 0),
                                        Pos(l.second, 0), Pos(l.second, 3), Pos(l.second, 4),
                                        Pos(l.last)}));
}

// Text at (i, 0xFFFFFFFF) and at (i, 0) sorts as text of one anchor; the walk takes
// the text that comes first in the list and passes the other, which lies behind it.
TEST_F(TextWalkTest, TextOnTheItemAndOnCharacterZeroTogetherStillEnds) {
    Layout l{};
    Doc doc(LayoutDocument(&l));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.first, kNo), u"A"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.first, 0), u"BB"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.first, 1), u"E"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.second, kNo), u"C"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.second, 0), u"D"), AN_OK);
    ASSERT_TRUE(TableInvariantsHold(doc));

    const std::vector<ANPos> walk = Walk(doc, Pos(l.plain), ANNextPos);
    EXPECT_TRUE(StrictlyAscending(walk));
    EXPECT_EQ(walk.back(), Pos(l.last));
    EXPECT_EQ(walk, (std::vector<ANPos>{Pos(l.plain), TextPos(l.first, kNo, 0), Pos(l.first, kNo),
                                        TextPos(l.first, 1, 0), Pos(l.first, 1), Pos(l.first, 2),
                                        TextPos(l.second, kNo, 0), Pos(l.second, kNo),
                                        Pos(l.second, 4), Pos(l.last)}));

    // Started inside the text at (i, 0), the walk reads it and goes on from its anchor.
    const std::vector<ANPos> inside = Walk(doc, TextPos(l.first, 0, 0), ANNextPos);
    EXPECT_TRUE(StrictlyAscending(inside));
    EXPECT_EQ(inside.size(), 10u);
}

TEST_F(TextWalkTest, ARangeOverTextOnTextItemsIsAddedAndTheTableStaysSound) {
    Layout l{};
    Doc doc(LayoutDocument(&l));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.first, kNo), u"A"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.first, 0), u"B"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.second, kNo), u"C"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(l.second, 0), u"D"), AN_OK);
    // Splitting walks the range with the merged walk; it must come to its end.
    EXPECT_EQ(annotest::AddRange(doc, Pos(l.plain), Pos(l.last), 7), AN_OK);
    EXPECT_TRUE(TableInvariantsHold(doc));
    EXPECT_TRUE(StrictlyAscending(Walk(doc, Pos(l.plain), ANNextPos)));
}

}  // namespace
