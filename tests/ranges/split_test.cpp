// Fitting range annotations to the document: the worked example, trimming the ends
// past skipped items and covered positions, and the one-position case.
#include <gtest/gtest.h>

#include <cstring>
#include <vector>

#include "range_support.h"

namespace {

using annotest::AddCutMark;
using annotest::AddHilite;
using annotest::AddPoint;
using annotest::AddRange;
using annotest::Doc;
using annotest::ListedEntries;
using annotest::Pos;
using annotest::TableOf;
using rangetest::kNo;
using rangetest::Mark;
using rangetest::Range;
using rangetest::Stored;
using rangetest::StoredEntries;

using SplitTest = rangetest::RangeTest;

// Items 1 to 9 of type 0 with field 2 0, except item 3 of type 240 and the cut items
// 4 and 7.
constexpr const char *kExample = "...Sc..c..";

TEST_F(SplitTest, WorkedExampleStoresTwoPiecesAndTwoMarkersWithOneNotification) {
    Doc doc(NewDoc(kExample));
    ADD_OK(AddRange(doc, Pos(1), Pos(8), 0x51, 0xABC));

    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(1, 3), Mark(4), Range(5, 7), Mark(7)}));
    // Added in that order, into a new table: slots 0 to 3 in turn.
    const auto listed = ListedEntries(doc);
    ASSERT_EQ(listed.size(), 4u);
    for (uint16_t i = 0; i < 4; ++i) EXPECT_EQ(listed[i].slot, i);
    for (const auto &e : listed) {
        EXPECT_EQ(e.record.size, AN_RECORD_SIZE_SHORT);
        EXPECT_EQ(e.record.tag, 0x51u);
        EXPECT_EQ(e.record.userData, 0xABCu);
        EXPECT_EQ(e.record.value, 0u) << "pieces and markers carry no value";
        EXPECT_EQ(e.record.eventMask, 0u);
    }
    EXPECT_EQ(listed[0].flags, ANENTRY_OWNS_USERDATA) << "pieces are the caller's block";
    EXPECT_EQ(listed[1].flags, 0) << "markers never free it";
    EXPECT_EQ(listed[2].flags, ANENTRY_OWNS_USERDATA);
    EXPECT_EQ(listed[3].flags, 0);

    ASSERT_EQ(notes.calls.size(), 1u);
    const annotest::Notification &n = notes.calls[0];
    EXPECT_EQ(n.code, ANNOTIFY_ADDED);
    EXPECT_EQ(n.detail, AN_TYPE_RANGE);
    EXPECT_EQ(n.record.start, Pos(1));
    EXPECT_EQ(n.record.end, Pos(8));
    EXPECT_EQ(n.record.tag, 0x51u);
    EXPECT_EQ(n.record.value, 0xFFFFFFFF00000000ull);

    // The skipped item and both cut positions lie in no piece; the markers say so.
    ANTrackInfo track{};
    const ANPos at1 = Pos(1);
    ASSERT_EQ(ANStartAnnoTrack(doc, &at1, &track), ANTRACK_ACTIVE);
    const uint32_t inRange[] = {0, 1, 1, 0, 0, 1, 1, 0, 0, 0};
    const uint32_t onMark[] = {0, 0, 0, 0, 1, 0, 0, 1, 0, 0};
    for (uint32_t i = 1; i < 10; ++i) {
        const ANPos p = Pos(i);
        ANTrackAnno(doc, &p, &track);
        EXPECT_EQ(track.rangeActive, inRange[i]) << "item " << i;
        EXPECT_EQ(track.markActive, onMark[i]) << "item " << i;
    }
}

TEST_F(SplitTest, GivenBackwardsTheRangeIsSplitTheSameWay) {
    Doc doc(NewDoc(kExample));
    ADD_OK(AddRange(doc, Pos(8), Pos(1)));
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(1, 3), Mark(4), Range(5, 7), Mark(7)}));
    ASSERT_EQ(notes.calls.size(), 1u);
    EXPECT_EQ(notes.calls[0].record.start, Pos(1));
}

// Every descriptor form of type 3 goes through splitting: none reaches the table
// as given.
TEST_F(SplitTest, EveryDescriptorFormIsSplit) {
    for (uint32_t size : {48u, 44u, 40u}) {
        Doc doc(NewDoc(kExample));
        unsigned char form[48] = {};
        const uint32_t tag = 4;
        const ANPos start = Pos(3), end = Pos(9);
        std::memcpy(form, &size, 4);
        std::memcpy(form + 4, &tag, 4);
        std::memcpy(form + 8, &start, sizeof start);
        std::memcpy(form + 24, &end, sizeof end);
        ADD_OK(ANAddAnno(doc, AN_TYPE_RANGE, form));
        EXPECT_EQ(StoredEntries(doc),
                  (std::vector<Stored>{Mark(4), Range(5, 7), Mark(7), Range(8, 9)}))
            << "form of " << size << " bytes";
        EXPECT_EQ(notes.calls.size(), 1u);
        notes.calls.clear();
    }
}

TEST_F(SplitTest, EmptyRangeBecomesOneStepWithoutPiecesOrMarkers) {
    Doc doc(NewDoc("....c...."));
    ADD_OK(AddRange(doc, Pos(2), Pos(2)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(2, 3)}));
    // A cut position on its own is one step too: it gets no marker.
    ADD_OK(AddRange(doc, Pos(4), Pos(4)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(2, 3), Range(4, 5)}));
    EXPECT_EQ(notes.calls.size(), 2u);
}

TEST_F(SplitTest, StartMovesPastSkippedItems) {
    Doc doc(NewDoc("..Ss....."));
    ADD_OK(AddRange(doc, Pos(2), Pos(6)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(4, 6)}));
}

TEST_F(SplitTest, StartMovesPastExistingRangesAndMarkers) {
    Doc doc(NewDoc(".........."));
    ADD_OK(AddCutMark(doc, Pos(3)));
    ADD_OK(AddRange(doc, Pos(3), Pos(5)));  // begins on the marker
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Mark(3), Range(4, 5)}));
    ADD_OK(AddRange(doc, Pos(4), Pos(7)));  // begins inside the range: the two merge
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Mark(3), Range(4, 7)}));
}

TEST_F(SplitTest, OnlyRangesAndMarkersCoverAPosition) {
    using Adder = uint32_t (*)(DAHandle);
    const Adder others[] = {
        [](DAHandle d) { return AddHilite(d, Pos(1), Pos(4)); },
        [](DAHandle d) { return AddPoint(d, Pos(2)); },
        [](DAHandle d) { return AddPoint(d, Pos(2), 1, 0, AN_TYPE_VALUE); },
        [](DAHandle d) { return annotest::AddText(d, Pos(2), u"ab"); },
        [](DAHandle d) { return annotest::AddPlaceholder(d, Pos(2)); },
    };
    for (const Adder add : others) {
        Doc doc(NewDoc(".........."));
        ADD_OK(add(doc));
        ADD_OK(AddRange(doc, Pos(2), Pos(5), 2));
        EXPECT_EQ(StoredEntries(doc).back(), Range(2, 5));
    }
}

TEST_F(SplitTest, RangeEndingAtAPositionDoesNotCoverIt) {
    Doc doc(NewDoc(".........."));
    ADD_OK(AddRange(doc, Pos(0), Pos(2)));
    ADD_OK(AddRange(doc, Pos(2), Pos(4)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(0, 4)})) << "touching ranges merge";
    ADD_OK(AddCutMark(doc, Pos(6)));
    ADD_OK(AddRange(doc, Pos(6, 0), Pos(8)));  // the marker ends at (6, 0)
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(0, 4), Mark(6), Range(Pos(6, 0), Pos(8))}));
}

TEST_F(SplitTest, GoodEndPositionKeepsTheEndEvenAfterCoveredPositions) {
    Doc doc(NewDoc(".........."));
    ADD_OK(AddCutMark(doc, Pos(5)));
    ADD_OK(AddCutMark(doc, Pos(6)));
    ADD_OK(AddRange(doc, Pos(2), Pos(7)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(2, 7), Mark(5), Mark(6)}));
}

TEST_F(SplitTest, EndComesInRightAfterTheLastGoodPosition) {
    Doc doc(NewDoc("....SS...."));
    ADD_OK(AddRange(doc, Pos(1), Pos(5)));  // 4 and the end position 5 skipped
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(1, 4)}));

    Doc other(NewDoc("....S....."));
    ADD_OK(AddCutMark(other, Pos(5)));
    ADD_OK(AddCutMark(other, Pos(6)));
    ADD_OK(AddRange(other, Pos(1), Pos(6)));  // 4 skipped, 5 and the end position marked
    EXPECT_EQ(StoredEntries(other), (std::vector<Stored>{Range(1, 4), Mark(5), Mark(6)}));
}

TEST_F(SplitTest, RangeWithoutGoodPositionShrinksToItsLastPositionBeforeTheEnd) {
    Doc doc(NewDoc("..SsS....."));
    ADD_OK(AddRange(doc, Pos(2), Pos(4)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(3, 4)}));

    // Covered instead of skipped: the result lies inside the existing range.
    Doc covered(NewDoc(".........."));
    ADD_OK(AddRange(covered, Pos(2), Pos(7)));
    ADD_OK(AddRange(covered, Pos(3), Pos(5)));
    EXPECT_EQ(StoredEntries(covered), (std::vector<Stored>{Range(2, 7), Range(4, 5)}));
    EXPECT_EQ(notes.calls.size(), 3u);
}

TEST_F(SplitTest, RangeOverCharactersOfTextItems) {
    antk::DocumentBuilder builder;
    builder.item(0);
    const uint32_t hello = builder.textItem("hello");
    const uint32_t cut = builder.cutItem();
    const uint32_t world = builder.textItem("world");
    builder.item(0);
    const auto h = builder.charIds(hello);
    const auto w = builder.charIds(world);
    Doc doc(WithState(builder.build()));
    ADD_OK(AddRange(doc, Pos(hello, h[1]), Pos(world, w[3])));
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(Pos(hello, h[1]), Pos(cut)), Mark(Pos(cut)),
                                   Range(Pos(world, w[0]), Pos(world, w[3]))}));
    // A range of one character.
    ADD_OK(AddRange(doc, Pos(hello, h[0]), Pos(hello, h[0])));
    EXPECT_EQ(StoredEntries(doc).front(), Range(Pos(hello, h[0]), Pos(cut)))
        << "[h0, h1) merges with the range starting at h1";
}

TEST_F(SplitTest, TextPositionOfASkippedItemIsSkipped) {
    Doc doc(NewDoc("...S......"));
    ADD_OK(annotest::AddText(doc, Pos(3), u"xyz"));
    ADD_OK(AddRange(doc, rangetest::TextPos(3, kNo, 0), Pos(6)));
    auto stored = StoredEntries(doc);
    ASSERT_EQ(stored.size(), 2u);
    EXPECT_EQ(stored[1], Range(4, 6));
}

TEST_F(SplitTest, RangeReachingPastTheDocumentEndsAtItsLastGoodPosition) {
    Doc doc(NewDoc("......"));  // items 0 to 5
    ADD_OK(AddRange(doc, Pos(2), Pos(50)));
    // There is no position after item 5 to end on; the end comes in to item 5.
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(2, 5)}));
}

TEST_F(SplitTest, RangeWhollyPastTheDocumentIsOneStep) {
    Doc doc(NewDoc("......"));
    ADD_OK(AddRange(doc, Pos(40), Pos(50)));
    ADD_OK(AddRange(doc, Pos(60), Pos(60)));
    EXPECT_EQ(StoredEntries(doc),
              (std::vector<Stored>{Range(Pos(40), Pos(40, 0)), Range(Pos(60), Pos(60, 0))}));
    EXPECT_EQ(notes.calls.size(), 2u);
}

TEST_F(SplitTest, LastPositionOfTheDocumentAloneIsOneStep) {
    Doc doc(NewDoc("......"));
    ADD_OK(AddRange(doc, Pos(5), Pos(5)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(Pos(5), Pos(5, 0))}));
}

TEST_F(SplitTest, FailuresToReachTheStateAddNothing) {
    Doc doc(NewDoc(kExample));
    antk::failCall(antk::Fn::DAGetAnno, 1, 77);
    EXPECT_EQ(AddRange(doc, Pos(1), Pos(8)), 77u);
    EXPECT_EQ(AddRange(nullptr, Pos(1), Pos(8)), AN_ERR_BADARG);
    Doc bare(rangetest::LaidOut(kExample));
    EXPECT_EQ(AddRange(bare, Pos(1), Pos(8)), AN_ERR_NOSTATE);
    EXPECT_EQ(TableOf(doc), nullptr);
    EXPECT_TRUE(notes.calls.empty());
}

}  // namespace
