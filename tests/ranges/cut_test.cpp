// Cutting range annotations into pieces: cut positions in content and in annotation
// text, markers that are already there, existing ranges along the way, and the piece
// left for ANAddRecord.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "hosts/heap.h"
#include "range_support.h"

namespace {

using annotest::AddCutMark;
using annotest::AddPlaceholder;
using annotest::AddRange;
using annotest::AddText;
using annotest::Doc;
using annotest::ListedEntries;
using annotest::Pos;
using annotest::TableOf;
using rangetest::kNo;
using rangetest::Mark;
using rangetest::Range;
using rangetest::Stored;
using rangetest::StoredEntries;
using rangetest::TextPos;

using CutTest = rangetest::RangeTest;

Stored Placeholder(uint32_t item) { return Stored{AN_TYPE_PLACEHOLDER, Pos(item), Pos(item, 0)}; }

TEST_F(CutTest, RangeWithoutCutsIsInsertedWhole) {
    Doc doc(NewDoc("........."));
    ADD_OK(AddRange(doc, Pos(1), Pos(6)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(1, 6)}));
    EXPECT_EQ(notes.calls.size(), 1u);
}

TEST_F(CutTest, CutAtTheFirstPositionGetsAMarkerButNoPieceBeforeIt) {
    Doc doc(NewDoc("....c...."));
    ADD_OK(AddRange(doc, Pos(4), Pos(7)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Mark(4), Range(5, 7)}));
}

TEST_F(CutTest, CutsSideBySideGetAMarkerEachAndNoPieceBetween) {
    Doc doc(NewDoc("...cc...."));
    ADD_OK(AddRange(doc, Pos(1), Pos(7)));
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(1, 3), Mark(3), Mark(4), Range(5, 7)}));
}

TEST_F(CutTest, CutJustBeforeTheEndLeavesNothingToInsertAfterIt) {
    Doc doc(NewDoc("....c...."));
    ADD_OK(AddRange(doc, Pos(1), Pos(5)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(1, 4), Mark(4)}));
    ASSERT_EQ(notes.calls.size(), 1u);
    EXPECT_EQ(notes.calls[0].record.end, Pos(5)) << "the range as given is announced";
}

TEST_F(CutTest, OnlyType0ItemsWithField2Of1Cut) {
    Doc doc(NewDoc("..pq.Sc.."));
    ADD_OK(AddRange(doc, Pos(1), Pos(8)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(1, 5), Mark(6), Range(7, 8)}))
        << "a piece ends before the skipped item in front of its cut";
}

TEST_F(CutTest, CutAlreadyMarkedGetsNoSecondMarker) {
    Doc doc(NewDoc("....c..c.."));
    ADD_OK(AddCutMark(doc, Pos(4), 3));
    ADD_OK(AddRange(doc, Pos(1), Pos(9), 5));
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(1, 4), Mark(4), Range(5, 7), Mark(7), Range(8, 9)}));
    EXPECT_EQ(ListedEntries(doc)[1].record.tag, 3u) << "the marker that was there";
    EXPECT_EQ(ListedEntries(doc)[3].record.tag, 5u) << "a new marker carries the range's tag";
}

// Tracking reports a marker once more at the next change point after it; only a
// marker covering the cut itself keeps the cut from getting its own.
TEST_F(CutTest, MarkerOnTheCutBeforeDoesNotStandForTheNextCut) {
    Doc doc(NewDoc("....cc...."));
    ADD_OK(AddCutMark(doc, Pos(4)));
    ADD_OK(AddRange(doc, Pos(1), Pos(8)));
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(1, 4), Mark(4), Mark(5), Range(6, 8)}));
}

TEST_F(CutTest, WithoutAnnotationsAheadEveryCutGetsAMarker) {
    Doc doc(NewDoc("....c..c.."));
    ADD_OK(AddRange(doc, Pos(0), Pos(1)));  // tracking from 2 finds nothing more
    ADD_OK(AddRange(doc, Pos(2), Pos(9)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(0, 1), Range(2, 4), Mark(4),
                                                       Range(5, 7), Mark(7), Range(8, 9)}));
}

TEST_F(CutTest, SkippedItemsRightAfterACutMakeAOneStepPiece) {
    Doc doc(NewDoc("....cSc..."));
    ADD_OK(AddRange(doc, Pos(1), Pos(9)));
    // The pass after the cut at 4 starts on the skipped item: the piece [5, 5) is
    // stored as one step.
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(1, 4), Mark(4), Range(5, 6), Mark(6), Range(7, 9)}));
}

TEST_F(CutTest, PiecesEndBeforeTheSkippedItemsInFrontOfACut) {
    Doc doc(NewDoc("..SSc...."));
    ADD_OK(AddRange(doc, Pos(0), Pos(7)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(0, 2), Mark(4), Range(5, 7)}));
}

// A placeholder added later puts a cut position inside an existing range.
TEST_F(CutTest, LastPieceStartsPastSkippedItemsAndMarkers) {
    Doc doc(NewDoc("....cS...."));
    ADD_OK(AddRange(doc, Pos(1), Pos(8)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(1, 4), Mark(4), Range(6, 8)}));

    Doc marked(NewDoc("....c....."));
    ADD_OK(AddCutMark(marked, Pos(5)));
    ADD_OK(AddRange(marked, Pos(1), Pos(8)));
    EXPECT_EQ(StoredEntries(marked),
              (std::vector<Stored>{Range(1, 4), Mark(4), Mark(5), Range(6, 8)}));
}

TEST_F(CutTest, CutsInsideExistingRangesAreNotExaminedAndTheRangesMerge) {
    Doc doc(NewDoc(".........."));
    ADD_OK(AddRange(doc, Pos(3), Pos(6)));
    ADD_OK(AddPlaceholder(doc, Pos(4)));
    ADD_OK(AddRange(doc, Pos(1), Pos(8)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(1, 8), Placeholder(4)}))
        << "no marker on the unit at 4";
}

TEST_F(CutTest, PieceTouchingAnExistingRangeMergesWithIt) {
    Doc doc(NewDoc("......c..."));
    ADD_OK(AddRange(doc, Pos(2), Pos(4)));
    ADD_OK(AddRange(doc, Pos(0), Pos(9)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(0, 6), Mark(6), Range(7, 9)}));

    Doc inside(NewDoc("......c..."));
    ADD_OK(AddRange(inside, Pos(1), Pos(4)));
    ADD_OK(AddRange(inside, Pos(2), Pos(8)));  // starts inside [1, 4)
    EXPECT_EQ(StoredEntries(inside), (std::vector<Stored>{Range(1, 6), Mark(6), Range(7, 8)}));
}

TEST_F(CutTest, PieceAfterACutStartsPastAnExistingRange) {
    Doc doc(NewDoc("....c...c."));
    ADD_OK(AddRange(doc, Pos(5), Pos(6)));
    ADD_OK(AddRange(doc, Pos(1), Pos(9)));
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(1, 4), Mark(4), Range(5, 8), Mark(8)}));
}

TEST_F(CutTest, PlaceholderInAnnotationTextIsACut) {
    Doc doc(NewDoc(".........."));
    ADD_OK(AddPlaceholder(doc, Pos(4)));
    ADD_OK(AddRange(doc, Pos(1), Pos(8)));
    const ANPos unit = TextPos(4, kNo, 0);
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(Pos(1), unit), Mark(unit), Placeholder(4), Range(4, 8)}));
}

TEST_F(CutTest, PlaceholderInsideTextIsACutAndTheCharactersAreNot) {
    Doc doc(NewDoc(".........."));
    ADD_OK(AddText(doc, Pos(4), u"ab"));
    ADD_OK(AddRange(doc, Pos(1), Pos(8)));
    auto stored = StoredEntries(doc);
    ASSERT_EQ(stored.size(), 2u);
    EXPECT_EQ(stored[0], Range(1, 8)) << "type-5 units do not cut";

    Doc split(NewDoc(".........."));
    ADD_OK(AddText(split, Pos(4), u"ab"));
    ADD_OK(AddPlaceholder(split, TextPos(4, kNo, 1)));  // a # b
    ASSERT_EQ(annotest::AnchorText(split, Pos(4)), u"a#b");
    ADD_OK(AddRange(split, Pos(1), Pos(8)));
    std::vector<Stored> ranges;
    for (const Stored &s : StoredEntries(split)) {
        if (s.type == AN_TYPE_RANGE || s.type == AN_TYPE_CUTMARK) ranges.push_back(s);
    }
    EXPECT_EQ(ranges,
              (std::vector<Stored>{Range(Pos(1), TextPos(4, kNo, 1)), Mark(TextPos(4, kNo, 1)),
                                   Range(TextPos(4, kNo, 2), Pos(8))}));
}

TEST_F(CutTest, ManyCutsGrowTheTableWhileTheWalkGoesOn) {
    std::string layout;
    for (int i = 0; i < 30; ++i) layout += "..c";
    Doc doc(NewDoc(layout));
    ADD_OK(AddRange(doc, Pos(0), Pos(89)));
    std::vector<Stored> expected;
    for (uint32_t i = 0; i < 30; ++i) {
        expected.push_back(Range(3 * i, 3 * i + 2));
        if (3 * i + 2 < 89) expected.push_back(Mark(3 * i + 2));
    }
    EXPECT_EQ(StoredEntries(doc), expected);
    EXPECT_EQ(notes.calls.size(), 1u);
}

// Every piece carries the caller's block; clearing the user data frees it once.
TEST_F(CutTest, PiecesShareTheCallersUserDataBlock) {
    Doc doc(NewDoc("...Sc..c.."));
    void *block = ANHeapAlloc(32);
    ASSERT_NE(block, nullptr);
    ADD_OK(AddRange(doc, Pos(1), Pos(9), 1, reinterpret_cast<uintptr_t>(block)));
    const auto listed = ListedEntries(doc);
    ASSERT_EQ(listed.size(), 5u);
    for (const auto &e : listed) EXPECT_EQ(e.record.userData, reinterpret_cast<uintptr_t>(block));
    EXPECT_EQ(ANClearUserData(doc), AN_OK);
    for (const auto &e : ListedEntries(doc)) EXPECT_EQ(e.record.userData, 0u);
}

}  // namespace
