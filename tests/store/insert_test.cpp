// Ordered insertion: where entries go, annotation text stored into its neighbours,
// text positions shifting around new text, ranges merging and texts splitting.
#include <gtest/gtest.h>

#include <vector>

#include "store/store_steps.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::AddHilite;
using annotest::AddPlaceholder;
using annotest::AddPoint;
using annotest::AddRange;
using annotest::AddText;
using annotest::AnchorText;
using annotest::Doc;
using annotest::Listed;
using annotest::ListedEntries;
using annotest::Pos;
using annotest::TableOf;
using annotest::TextPos;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;

class InsertTest : public annotest::LeakCheckedTest {
 protected:
    // A plain document with annotation state.
    static DAHandle NewDoc(uint32_t items = 8) {
        DAHandle doc = annotest::PlainDocument(items);
        EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        return doc;
    }
};

std::vector<uint32_t> TagsInOrder(DAHandle doc) {
    std::vector<uint32_t> tags;
    for (const Listed &e : ListedEntries(doc)) tags.push_back(e.record.tag);
    return tags;
}

const Listed &ByTag(const std::vector<Listed> &listed, uint32_t tag) {
    for (const Listed &e : listed) {
        if (e.record.tag == tag) return e;
    }
    ADD_FAILURE() << "no entry with tag " << tag;
    return listed.front();
}

TEST_F(InsertTest, FirstTextAtAContentPositionIsOneEntryAtThatPosition) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), u"abc", 5));
    const auto listed = ListedEntries(doc);
    ASSERT_EQ(listed.size(), 1u);
    EXPECT_EQ(listed[0].type, AN_TYPE_TEXT);
    EXPECT_EQ(listed[0].record.size, 96u);
    EXPECT_EQ(listed[0].record.start, Pos(2));
    EXPECT_EQ(listed[0].record.end, Pos(2, 0)) << "one step after the item itself";
    EXPECT_EQ(listed[0].text, u"abc");
    EXPECT_EQ(listed[0].record.textCapacity, 64u);
    EXPECT_EQ(listed[0].record.text, nullptr);
}

// A range's end moves into text inserted where it ends only when its start stays at
// or before it.
TEST_F(InsertTest, RangesEndingWhereTextGoesInNeverEndBeforeTheyStart) {
    antk::DocumentBuilder builder;
    builder.item(1);
    const uint32_t textItem = builder.textItem("abc");
    Doc doc(builder.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const uint32_t firstChar = antk::items(doc)[1].firstChar;

    ADD_OK(AddHilite(doc, Pos(0), Pos(0), 1));                           // empty, at item 0
    ADD_OK(AddHilite(doc, Pos(textItem), Pos(textItem, firstChar), 2));  // item to its 1st char
    ADD_OK(AddText(doc, Pos(0), u"xy", 3));
    ADD_OK(AddText(doc, Pos(textItem, firstChar), u"z", 4));
    EXPECT_TRUE(annotest::TableInvariantsHold(doc));
    const auto listed = ListedEntries(doc);
    EXPECT_EQ(ByTag(listed, 1).record.end, Pos(0)) << "an empty range stays empty";
    EXPECT_EQ(ByTag(listed, 2).record.end, Pos(textItem, firstChar))
        << "text at the first character sorts before the item: the end stays";
    for (const Listed &e : listed) {
        EXPECT_LE(ANCompPos(&e.record.start, &e.record.end), 0) << "tag " << e.record.tag;
    }
}

TEST_F(InsertTest, TextBufferGrowsInStepsOf64AboveItsLength) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), std::u16string(64, u'a')));
    EXPECT_EQ(ListedEntries(doc)[0].record.textCapacity, 128u) << "64 units need 128";
    ADD_OK(AddText(doc, Pos(2), std::u16string(63, u'b')));
    EXPECT_EQ(ListedEntries(doc)[0].record.textCapacity, 128u);
    ADD_OK(AddText(doc, Pos(2), u"c"));
    EXPECT_EQ(ListedEntries(doc)[0].record.textCapacity, 192u);
    EXPECT_EQ(ListedEntries(doc)[0].record.textLength, 128u);
}

TEST_F(InsertTest, EqualStartsKeepTheOrderAddedAndLaterStartsComeAfter) {
    Doc doc(NewDoc());
    ADD_OK(AddPoint(doc, Pos(3), 1));
    ADD_OK(AddHilite(doc, Pos(3), Pos(4), 2));
    ADD_OK(AddPoint(doc, Pos(5), 3));
    ADD_OK(AddPoint(doc, Pos(3), 4));
    ADD_OK(AddPoint(doc, Pos(1), 5));
    EXPECT_EQ(TagsInOrder(doc), (std::vector<uint32_t>{5, 1, 2, 4, 3}));
}

TEST_F(InsertTest, TextGoesBeforeOtherAnnotationsStartingWhereItStarts) {
    Doc doc(NewDoc());
    ADD_OK(AddHilite(doc, Pos(3), Pos(5), 1));
    ADD_OK(AddText(doc, Pos(3), u"ab", 2));
    ADD_OK(AddPlaceholder(doc, Pos(3), 3));
    EXPECT_EQ(TagsInOrder(doc), (std::vector<uint32_t>{2, 3, 1}));
    EXPECT_EQ(ListedEntries(doc)[2].record.start, Pos(3)) << "a range starting there stays";
    EXPECT_EQ(AnchorText(doc, Pos(3)), u"ab#");
}

TEST_F(InsertTest, TextAtAPositionWithTextIsAppendedWithoutANewEntry) {
    Doc doc(NewDoc());
    annotest::Notifications notes;
    notes.Attach(doc);
    ADD_OK(AddText(doc, Pos(2), u"abc", 1));
    ADD_OK(AddText(doc, Pos(2), u"de", 2));
    EXPECT_EQ(TableOf(doc)->count, 1);
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abcde");
    EXPECT_EQ(ListedEntries(doc)[0].record.tag, 1u) << "the existing entry keeps its fields";
    ASSERT_EQ(notes.calls.size(), 2u) << "a merged text is still announced";
    EXPECT_EQ(notes.calls[1].code, ANNOTIFY_ADDED);
    EXPECT_EQ(notes.calls[1].detail, AN_TYPE_TEXT);
    EXPECT_EQ(notes.calls[1].record.tag, 2u);
    EXPECT_EQ(notes.calls[1].record.textLength, 2u);
    EXPECT_EQ(notes.calls[1].record.textBuffer, nullptr);
    EXPECT_NE(notes.calls[1].record.text, nullptr) << "still the caller's text";
}

TEST_F(InsertTest, TextInsideTextGoesIntoTheEntrySpanningItsIndex) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), u"abcdef"));
    ADD_OK(AddText(doc, TextPos(2, kNo, 2), u"XY"));
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abXYcdef");
    EXPECT_EQ(TableOf(doc)->count, 1);

    ADD_OK(AddPlaceholder(doc, TextPos(2, kNo, 4)));  // ab XY # cdef
    ASSERT_EQ(AnchorText(doc, Pos(2)), u"abXY#cdef");
    ADD_OK(AddText(doc, TextPos(2, kNo, 7), u"12"));  // inside cdef at offset 2
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abXY#cd12ef");
    ADD_OK(AddText(doc, TextPos(2, kNo, 5), u"<"));  // at the front of the text after #
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abXY#<cd12ef");
    ADD_OK(AddText(doc, TextPos(2, kNo, 4), u">"));  // right behind the text before #
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abXY>#<cd12ef");
    ADD_OK(AddText(doc, TextPos(2, kNo, 13), u"!"));  // at the very end
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abXY>#<cd12ef!");
    EXPECT_EQ(TableOf(doc)->count, 3);
}

TEST_F(InsertTest, PlaceholderInsideATextSplitsItAroundTheUnit) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), u"123456", 9, 0x5000));
    ADD_OK(AddPlaceholder(doc, TextPos(2, kNo, 3), 4));
    const auto listed = ListedEntries(doc);
    ASSERT_EQ(listed.size(), 3u);
    EXPECT_EQ(listed[0].type, AN_TYPE_TEXT);
    EXPECT_EQ(listed[0].text, u"123");
    EXPECT_EQ(listed[0].record.start, TextPos(2, kNo, 3));
    EXPECT_EQ(listed[0].record.end, TextPos(2, kNo, 4));
    EXPECT_EQ(listed[1].type, AN_TYPE_PLACEHOLDER);
    EXPECT_EQ(listed[1].record.start, TextPos(2, kNo, 4));
    EXPECT_EQ(listed[2].text, u"456");
    EXPECT_EQ(listed[2].record.textLength, 3u);
    EXPECT_EQ(listed[2].record.start, Pos(2));
    // The split-off part stands for the same annotation as the rest.
    EXPECT_EQ(listed[0].record.size, 96u);
    EXPECT_EQ(listed[0].record.tag, 9u);
    EXPECT_EQ(listed[0].record.userData, 0x5000u);
    EXPECT_EQ(listed[0].flags, listed[2].flags);
    EXPECT_EQ(listed[0].flags, ANENTRY_OWNS_USERDATA);
    EXPECT_EQ(listed[0].record.textCapacity, 64u);
}

TEST_F(InsertTest, PlaceholderAtTheStartOrEndOfATextDoesNotSplitIt) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), u"abc"));
    ADD_OK(AddPlaceholder(doc, TextPos(2, kNo, 0)));
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"#abc");
    ADD_OK(AddPlaceholder(doc, Pos(2)));
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"#abc#");
    EXPECT_EQ(TableOf(doc)->count, 3);
}

TEST_F(InsertTest, PlaceholderRightBehindATextLeavesThatTextWhereItIs) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), u"abc", 1));
    ADD_OK(AddPlaceholder(doc, Pos(2), 2));
    ASSERT_EQ(ListedEntries(doc)[0].record.start, TextPos(2, kNo, 3));
    ADD_OK(AddPlaceholder(doc, TextPos(2, kNo, 3), 3));
    const auto listed = ListedEntries(doc);
    EXPECT_EQ(ByTag(listed, 1).record.start, TextPos(2, kNo, 3)) << "its units did not move";
    EXPECT_EQ(ByTag(listed, 3).record.start, TextPos(2, kNo, 4));
    EXPECT_EQ(ByTag(listed, 2).record.start, Pos(2));
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abc##");
}

TEST_F(InsertTest, RangeEndingAtTheAnchorEndsWhereNewTextBegins) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), u"abc", 1));
    ADD_OK(AddHilite(doc, Pos(1), Pos(2), 2));
    ADD_OK(AddHilite(doc, Pos(1), Pos(3), 3));
    ADD_OK(AddText(doc, Pos(2), u"de", 4));
    const auto listed = ListedEntries(doc);
    EXPECT_EQ(ByTag(listed, 2).record.end, TextPos(2, kNo, 3)) << "b = 3 units were there";
    EXPECT_EQ(ByTag(listed, 3).record.end, Pos(3)) << "a range across the text is unchanged";
}

TEST_F(InsertTest, TextInsideTextMovesRangesAtItsIndexButNotPointsThere) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), u"abcdef", 1));
    ADD_OK(AddHilite(doc, TextPos(2, kNo, 2), Pos(3), 2));
    ADD_OK(AddHilite(doc, TextPos(2, kNo, 0), TextPos(2, kNo, 2), 3));
    ADD_OK(AddHilite(doc, TextPos(2, kNo, 1), TextPos(2, kNo, 4), 4));
    ADD_OK(AddPoint(doc, TextPos(2, kNo, 2), 5));
    ADD_OK(AddPoint(doc, TextPos(2, kNo, 4), 6));
    ADD_OK(AddPoint(doc, TextPos(2, kNo, 1), 7));
    ADD_OK(AddText(doc, TextPos(2, kNo, 2), u"XY", 8));
    const auto listed = ListedEntries(doc);
    EXPECT_EQ(ByTag(listed, 2).record.start, TextPos(2, kNo, 4));
    EXPECT_EQ(ByTag(listed, 3).record.end, TextPos(2, kNo, 2)) << "ends where the text goes in";
    EXPECT_EQ(ByTag(listed, 4).record.start, TextPos(2, kNo, 1));
    EXPECT_EQ(ByTag(listed, 4).record.end, TextPos(2, kNo, 6));
    EXPECT_EQ(ByTag(listed, 5).record.start, TextPos(2, kNo, 2)) << "a point at k stays";
    EXPECT_EQ(ByTag(listed, 5).record.end, TextPos(2, kNo, 3));
    EXPECT_EQ(ByTag(listed, 6).record.start, TextPos(2, kNo, 6));
    EXPECT_EQ(ByTag(listed, 6).record.end, TextPos(2, kNo, 7));
    EXPECT_EQ(ByTag(listed, 7).record.start, TextPos(2, kNo, 1));
}

// Text added at a content position where a point starts moves the point into the
// new text, ahead of the text entry listed before it: the list is put back in order.
TEST_F(InsertTest, PointMovedIntoNewTextIsListedInDocumentOrder) {
    Doc doc(NewDoc());
    ADD_OK(AddPoint(doc, Pos(2), 1));
    ADD_OK(AddText(doc, Pos(2), u"abc", 2));
    auto listed = ListedEntries(doc);
    EXPECT_EQ(ByTag(listed, 1).record.start, TextPos(2, kNo, 0));
    EXPECT_EQ(TagsInOrder(doc), (std::vector<uint32_t>{1, 2}));

    ADD_OK(AddPoint(doc, Pos(2), 3));        // after the text, at the content position
    ADD_OK(AddText(doc, Pos(2), u"de", 4));  // appended: the point moves to index 3
    listed = ListedEntries(doc);
    EXPECT_EQ(ByTag(listed, 3).record.start, TextPos(2, kNo, 3));
    EXPECT_EQ(TagsInOrder(doc), (std::vector<uint32_t>{1, 3, 2}));
}

// Text inside annotation text at k moves a range starting at k past a point at k
// that was listed after it.
TEST_F(InsertTest, RangeMovedPastAPointAtTheSameIndexIsListedAfterIt) {
    Doc doc(NewDoc());
    ADD_OK(AddText(doc, Pos(2), u"abcdef", 1));
    ADD_OK(AddRange(doc, TextPos(2, kNo, 2), TextPos(2, kNo, 4), 2));
    ADD_OK(AddPoint(doc, TextPos(2, kNo, 2), 3));
    ADD_OK(AddHilite(doc, TextPos(2, kNo, 2), TextPos(2, kNo, 3), 4));
    ASSERT_EQ(TagsInOrder(doc), (std::vector<uint32_t>{2, 3, 4, 1}));
    ADD_OK(AddText(doc, TextPos(2, kNo, 2), u"XY", 5));
    EXPECT_EQ(TagsInOrder(doc), (std::vector<uint32_t>{3, 2, 4, 1})) << "ties keep their order";
}

// An annotation on a text item itself sorts before the item's characters; it must
// not hide the annotations anchored at a character from the shift.
TEST_F(InsertTest, AnnotationOnTheItemDoesNotStopTheShiftAtItsCharacters) {
    antk::DocumentBuilder builder;
    builder.item(1);
    const uint32_t item = builder.textItem("hello world");
    const uint32_t c5 = builder.charIds(item)[5];
    const uint32_t c9 = builder.charIds(item)[9];
    Doc doc(builder.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ADD_OK(AddHilite(doc, Pos(item), Pos(item, c5), 1));
    ADD_OK(AddHilite(doc, Pos(item), Pos(item, c9), 2));
    ADD_OK(AddText(doc, Pos(item, c5), u"abcd", 3));
    EXPECT_EQ(ByTag(ListedEntries(doc), 1).record.end, TextPos(item, c5, 0));
    ADD_OK(AddPlaceholder(doc, TextPos(item, c5, 2), 4));
    ADD_OK(AddText(doc, TextPos(item, c5, 1), u"XY", 5));
    EXPECT_EQ(AnchorText(doc, Pos(item, c5)), u"aXYb#cd");
}

TEST_F(InsertTest, TouchingOrOverlappingRangesMergeIntoTheirNeighbour) {
    Doc doc(NewDoc(20));
    annotest::Notifications notes;
    notes.Attach(doc);
    ADD_OK(AddRange(doc, Pos(3), Pos(5), 1));
    ADD_OK(AddRange(doc, Pos(5), Pos(7), 2));  // touches the end of the one before
    ADD_OK(AddRange(doc, Pos(1), Pos(3), 3));  // covers the start of the one after
    auto listed = ListedEntries(doc);
    ASSERT_EQ(listed.size(), 1u);
    EXPECT_EQ(listed[0].record.start, Pos(1));
    EXPECT_EQ(listed[0].record.end, Pos(7));
    EXPECT_EQ(listed[0].record.tag, 1u);
    EXPECT_EQ(notes.calls.size(), 3u) << "every add is announced, merged or not";

    ADD_OK(AddRange(doc, Pos(9), Pos(10), 4));
    ADD_OK(AddRange(doc, Pos(6), Pos(8), 5));  // extends the first only
    ADD_OK(AddRange(doc, Pos(11), Pos(12), 6));
    ADD_OK(AddRange(doc, Pos(10), Pos(13), 7));  // swallows [11, 12) and reaches [9, 10)
    listed = ListedEntries(doc);
    ASSERT_EQ(listed.size(), 3u);
    EXPECT_EQ(listed[0].record.end, Pos(8));
    EXPECT_EQ(listed[1].record.start, Pos(9));
    EXPECT_EQ(listed[1].record.end, Pos(13));
    EXPECT_EQ(listed[2].record.start, Pos(10));
    EXPECT_EQ(listed[2].record.end, Pos(13));
}

TEST_F(InsertTest, RangesDoNotMergeWithOtherTypes) {
    Doc doc(NewDoc());
    ADD_OK(AddHilite(doc, Pos(1), Pos(3), 1));
    ADD_OK(AddRange(doc, Pos(3), Pos(5), 2));
    ADD_OK(AddRange(doc, Pos(6), Pos(7), 3));
    EXPECT_EQ(TableOf(doc)->count, 3);
}

TEST_F(InsertTest, TextPositionsOutsideTheAnnotationTextAreRefused) {
    Doc doc(NewDoc());
    annotest::Notifications notes;
    notes.Attach(doc);
    EXPECT_STEP(AN_ERR_BADARG, AddText(doc, TextPos(2, kNo, 0), u"x"));
    EXPECT_EQ(TableOf(doc), nullptr) << "no text there yet";
    ADD_OK(AddText(doc, Pos(2), u"abc"));
    ADD_OK(AddPlaceholder(doc, Pos(2)));  // abc#
    EXPECT_STEP(AN_ERR_BADARG, AddText(doc, TextPos(2, kNo, 5), u"x"));
    // Behind a closing placeholder: text goes there through the content position.
    EXPECT_STEP(AN_ERR_BADARG, AddText(doc, TextPos(2, kNo, 4), u"x"));
    EXPECT_STEP(AN_ERR_BADARG, AddPlaceholder(doc, TextPos(2, kNo, 9)));
    EXPECT_STEP(AN_ERR_BADARG, AddPlaceholder(doc, TextPos(3, kNo, 0)));
    // Another anchor by its fields, although its positions sort the same.
    EXPECT_STEP(AN_ERR_BADARG, AddText(doc, TextPos(2, 0, 1), u"x"));
    EXPECT_EQ(notes.calls.size(), 2u);
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abc#");
    ADD_OK(AddText(doc, TextPos(2, kNo, 3), u"x"));
    EXPECT_EQ(AnchorText(doc, Pos(2)), u"abcx#");
}

}  // namespace
