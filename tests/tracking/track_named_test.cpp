// Starting, ending and stepping a tracking record through named situations.
#include <gtest/gtest.h>

#include <cstring>

#include "positions/order.h"
#include "support/fixture.h"
#include "tracking/hand_table.h"
#include "tracking/walk_check.h"

namespace {

using annotest::Doc;
using annotest::PlainDocument;
using annotest::Pos;
using antk::Fn;
using tracktest::HandEntry;
using tracktest::InstallTable;
using tracktest::Rec;

constexpr uint32_t kRed = 0x09;    // direct word: color1 black, color2 red
constexpr uint32_t kGreen = 0xA0;  // color1 green, color2 black
constexpr uint32_t kBlue = 0xC0;   // color1 blue

ANTrackInfo Marked() {
    ANTrackInfo track;
    std::memset(&track, 0x5A, sizeof track);
    track.markActive = 0;
    return track;
}

bool Same(const ANTrackInfo &a, const ANTrackInfo &b) { return std::memcmp(&a, &b, sizeof a) == 0; }

HandEntry Hilite(uint16_t slot, uint32_t from, uint32_t to, uint32_t word, uint64_t user = 0) {
    return {slot, AN_TYPE_HILITE, Rec(Pos(from), Pos(to), user, 0, word)};
}
HandEntry Point(uint16_t slot, uint16_t type, uint32_t at, uint64_t user = 0, uint64_t value = 0) {
    return {slot, type, Rec(Pos(at), ANStepAfter(Pos(at)), user, value)};
}
HandEntry Span(uint16_t slot, uint16_t type, uint32_t from, uint32_t to, uint64_t user = 0) {
    return {slot, type, Rec(Pos(from), Pos(to), user)};
}

class TrackTest : public annotest::LeakCheckedTest {
 protected:
    // A document of ten plain items (positions 0..9) with `entries` as its table.
    DAHandle Make(const std::vector<HandEntry> &entries) {
        DAHandle doc = PlainDocument(10);
        EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        InstallTable(doc, entries);
        return doc;
    }
    uint32_t Start(DAHandle doc, uint32_t at, ANTrackInfo &track) {
        const ANPos p = Pos(at);
        return ANStartAnnoTrack(doc, &p, &track);
    }
    uint32_t At(DAHandle doc, uint32_t at, ANTrackInfo &track) {
        const ANPos p = Pos(at);
        return ANTrackAnno(doc, &p, &track);
    }
};

// ---- Starting and ending ----------------------------------------------------------------

TEST_F(TrackTest, StartWithoutAStateLeavesTheRecordUntouched) {
    const ANTrackInfo marked = Marked();
    ANTrackInfo track = marked;
    EXPECT_EQ(Start(nullptr, 0, track), ANTRACK_NONE);
    Doc bare(PlainDocument(2));
    EXPECT_EQ(Start(bare, 0, track), ANTRACK_NONE);
    Doc doc(Make({Hilite(0, 1, 3, kRed)}));
    antk::failCall(Fn::DAGetAnno, 1, 66);
    EXPECT_EQ(Start(doc, 0, track), ANTRACK_NONE);
    EXPECT_TRUE(Same(track, marked));
    const ANPos p = Pos(0);
    EXPECT_EQ(ANStartAnnoTrack(doc, nullptr, &track), ANTRACK_NONE);
    EXPECT_EQ(ANStartAnnoTrack(doc, &p, nullptr), ANTRACK_NONE);
}

TEST_F(TrackTest, StartWithoutAnnotationsClearsOnlyTheOutputFlags) {
    for (bool emptyTable : {false, true}) {
        DAHandle handle = PlainDocument(2);
        ASSERT_EQ(ANInit(handle, nullptr, nullptr, nullptr), AN_OK);
        if (emptyTable) InstallTable(handle, {});
        Doc doc(handle);
        ANTrackInfo expected = Marked();
        expected.markActive = 1;
        ANTrackInfo track = expected;
        EXPECT_EQ(Start(doc, 0, track), ANTRACK_NONE);
        expected.rangeActive = expected.color1Set = expected.color2Set = expected.attrSet = 0;
        EXPECT_TRUE(Same(track, expected)) << "cursor, nextChange and markActive are kept";
        EXPECT_EQ(At(doc, 5, track), 0u);
    }
}

TEST_F(TrackTest, StartPastEveryAnnotationReturnsNoMoreAndTrackingStaysQuiet) {
    Doc doc(Make({Hilite(0, 1, 3, kRed), Span(1, AN_TYPE_CUTMARK, 2, 4)}));
    ANTrackInfo track = Marked();
    track.nextChange = ANPos{7, 7, 3, 9};
    EXPECT_EQ(Start(doc, 5, track), ANTRACK_NOMORE);
    EXPECT_EQ(track.nextChange, (ANPos{0xFFFFFFFF, 0xFFFFFFFF, 3, 9}));
    EXPECT_EQ(track.cursor, AN_NONE);
    EXPECT_EQ(track.hiliteEntry, AN_NONE);
    const ANTrackInfo after = track;
    for (uint32_t p : {5u, 6u, 9u, 0xFFFFFFFEu}) EXPECT_EQ(At(doc, p, track), 0u) << p;
    EXPECT_TRUE(Same(track, after));
}

TEST_F(TrackTest, StartPlacesTheCursorAndTheFirstChangePoint) {
    Doc doc(Make({Span(4, AN_TYPE_RANGE, 1, 3), Hilite(2, 3, 6, kRed), Point(0, 2, 8)}));
    ANTrackInfo track = Marked();
    EXPECT_EQ(Start(doc, 0, track), ANTRACK_ACTIVE) << "before every annotation";
    EXPECT_EQ(track.cursor, 4);
    EXPECT_EQ(track.nextChange, Pos(1));
    EXPECT_EQ(Start(doc, 2, track), ANTRACK_ACTIVE) << "inside the first";
    EXPECT_EQ(track.cursor, 4);
    EXPECT_EQ(track.nextChange, Pos(2));
    EXPECT_EQ(Start(doc, 3, track), ANTRACK_ACTIVE) << "where the first ends";
    EXPECT_EQ(track.cursor, 4) << "an entry ending at the start still becomes the cursor";
    EXPECT_EQ(track.nextChange, Pos(3));
    EXPECT_EQ(Start(doc, 7, track), ANTRACK_ACTIVE) << "between the last two";
    EXPECT_EQ(track.cursor, 0);
    EXPECT_EQ(track.nextChange, Pos(8));
    EXPECT_EQ(At(doc, 7, track), 0u);
    EXPECT_EQ(At(doc, 8, track), ANTRACK_BIT_POINT);
}

TEST_F(TrackTest, MarkerLeftInTheRecordIsReportedOnceByTheFirstFullCall) {
    Doc doc(Make({Hilite(0, 2, 4, kRed)}));
    ANTrackInfo track = Marked();
    track.markActive = 1;
    ASSERT_EQ(Start(doc, 0, track), ANTRACK_ACTIVE);
    EXPECT_EQ(track.markActive, 1u);
    EXPECT_EQ(At(doc, 1, track), 0u) << "before the first change point";
    EXPECT_EQ(At(doc, 2, track), ANTRACK_BIT_CUTMARK | ANTRACK_BIT_HILITE);
    EXPECT_EQ(track.markActive, 0u);
    EXPECT_EQ(At(doc, 4, track), ANTRACK_BIT_HILITE);
}

TEST_F(TrackTest, EndReadsNothingAndReturnsZero) {
    EXPECT_EQ(ANEndAnnoTrack(nullptr, nullptr), 0u);
    Doc doc(Make({Hilite(0, 2, 4, kRed)}));
    ANTrackInfo track = Marked();
    const ANTrackInfo before = track;
    EXPECT_EQ(ANEndAnnoTrack(doc, &track), 0u);
    EXPECT_TRUE(Same(track, before));
}

// ---- Reports ------------------------------------------------------------------------------

TEST_F(TrackTest, NothingIsReadOrWrittenBeforeTheNextChangePoint) {
    Doc doc(Make({Span(0, AN_TYPE_RANGE, 4, 6)}));
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 0, track), ANTRACK_ACTIVE);
    track.rangeActive = 1;
    track.markActive = 1;
    const ANTrackInfo before = track;
    EXPECT_EQ(At(doc, 3, track), 0u);
    EXPECT_TRUE(Same(track, before));
}

TEST_F(TrackTest, RangeIsReportedAtItsStartAndOnceMoreAtItsEnd) {
    Doc doc(Make({Span(0, AN_TYPE_RANGE, 1, 3, 0xAB)}));
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 0, track), ANTRACK_ACTIVE);
    EXPECT_EQ(At(doc, 0, track), 0u);
    EXPECT_EQ(At(doc, 1, track), ANTRACK_BIT_RANGE);
    EXPECT_EQ(track.rangeActive, 1u);
    EXPECT_EQ(track.userData, 0xABu);
    EXPECT_EQ(At(doc, 2, track), 0u);
    EXPECT_EQ(At(doc, 3, track), ANTRACK_BIT_RANGE);
    EXPECT_EQ(track.rangeActive, 0u);
    EXPECT_EQ(track.nextChange.itemId, 0xFFFFFFFFu);
    EXPECT_EQ(At(doc, 4, track), 0u);
}

TEST_F(TrackTest, PointsReportTheirValueOnlyAtTheirPosition) {
    Doc doc(Make({Point(1, AN_TYPE_POINT, 1, 0, 0x22), Point(0, AN_TYPE_VALUE, 3, 0, 0x44),
                  Point(2, AN_TYPE_PLACEHOLDER, 5, 0, 0x66)}));
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 0, track), ANTRACK_ACTIVE);
    EXPECT_EQ(At(doc, 1, track), ANTRACK_BIT_POINT);
    EXPECT_EQ(track.value, 0x22u);
    EXPECT_EQ(At(doc, 2, track), 0u) << "a full call past the point's end reports nothing";
    EXPECT_EQ(At(doc, 3, track), ANTRACK_BIT_VALUE);
    EXPECT_EQ(track.value, 0x44u);
    EXPECT_EQ(At(doc, 4, track), 0u);
    EXPECT_EQ(At(doc, 5, track), 0u) << "placeholders are never reported";
    EXPECT_EQ(track.value, 0x44u);
}

TEST_F(TrackTest, TextAndMarkersReportTheirDetails) {
    ANAnnoRecord text = tracktest::TextRec(Pos(2), ANStepAfter(Pos(2)), u"abc", 0x77);
    const uint16_t *buffer = text.textBuffer;
    Doc doc(Make({{3, AN_TYPE_TEXT, text}, Span(1, AN_TYPE_CUTMARK, 2, 4)}));
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 0, track), ANTRACK_ACTIVE);
    EXPECT_EQ(At(doc, 2, track), ANTRACK_BIT_TEXT | ANTRACK_BIT_CUTMARK);
    EXPECT_EQ(track.textBuffer, buffer);
    EXPECT_EQ(track.textLength, 3u);
    EXPECT_EQ(track.userData, 0x77u);
    EXPECT_EQ(track.markActive, 1u);
    EXPECT_EQ(At(doc, 3, track), ANTRACK_BIT_CUTMARK) << "the text's end is a change point";
    EXPECT_EQ(track.markActive, 1u);
    EXPECT_EQ(At(doc, 4, track), ANTRACK_BIT_CUTMARK) << "once more after the marker ends";
    EXPECT_EQ(track.markActive, 0u);
    EXPECT_EQ(At(doc, 5, track), 0u);
}

// ---- Highlight precedence ---------------------------------------------------------------

struct Colours {
    uint32_t bits;
    uint16_t hilite;
    uint32_t color1Set;
    uint32_t color1;
};

std::vector<Colours> WalkColours(TrackTest *, DAHandle doc, uint32_t from, uint32_t to) {
    std::vector<Colours> seen;
    ANTrackInfo track = Marked();
    ANPos p = Pos(from);
    EXPECT_EQ(ANStartAnnoTrack(doc, &p, &track), ANTRACK_ACTIVE);
    for (uint32_t i = from; i <= to; ++i) {
        p = Pos(i);
        const uint32_t bits = ANTrackAnno(doc, &p, &track);
        seen.push_back({bits, track.hiliteEntry, track.color1Set, track.color1});
    }
    return seen;
}

TEST_F(TrackTest, NestedHighlightWinsInsideTheOuterOneWhateverTheSlots) {
    for (auto slots : {std::pair<uint16_t, uint16_t>{0, 1}, {1, 0}}) {
        const auto [outer, inner] = slots;
        Doc doc(Make({Hilite(outer, 1, 4, kGreen), Hilite(inner, 2, 3, kBlue)}));
        const std::vector<Colours> seen = WalkColours(this, doc, 1, 5);
        EXPECT_EQ(seen[0].hilite, outer);
        EXPECT_EQ(seen[0].color1, 0x00FF00u);
        EXPECT_EQ(seen[1].hilite, inner);
        EXPECT_EQ(seen[1].color1, 0xFF0000u);
        EXPECT_EQ(seen[2].hilite, outer) << "the outer one again after the inner ends";
        EXPECT_EQ(seen[2].color1, 0x00FF00u);
        for (int i = 0; i < 3; ++i) EXPECT_EQ(seen[i].bits, ANTRACK_BIT_HILITE) << i;
        EXPECT_EQ(seen[3].bits, ANTRACK_BIT_HILITE) << "the end of the last highlight";
        EXPECT_EQ(seen[3].hilite, AN_NONE);
        EXPECT_EQ(seen[3].color1Set, 0u);
        EXPECT_EQ(seen[4].bits, 0u);
    }
}

TEST_F(TrackTest, OfOverlappingHighlightsTheHigherSlotTakesOver) {
    {
        Doc doc(Make({Hilite(3, 1, 3, kGreen), Hilite(7, 2, 4, kBlue)}));
        const std::vector<Colours> seen = WalkColours(this, doc, 1, 4);
        EXPECT_EQ(seen[0].hilite, 3);
        EXPECT_EQ(seen[1].hilite, 7) << "the later, higher slot takes over where it starts";
        EXPECT_EQ(seen[1].color1, 0xFF0000u);
        EXPECT_EQ(seen[2].hilite, 7);
        EXPECT_EQ(seen[3].hilite, AN_NONE);
    }
    {
        Doc doc(Make({Hilite(7, 1, 3, kGreen), Hilite(3, 2, 4, kBlue)}));
        const std::vector<Colours> seen = WalkColours(this, doc, 1, 4);
        EXPECT_EQ(seen[0].hilite, 7);
        EXPECT_EQ(seen[1].hilite, 7) << "the first keeps its colours until it ends";
        EXPECT_EQ(seen[1].bits, ANTRACK_BIT_HILITE);
        EXPECT_EQ(seen[1].color1Set, 1u);
        EXPECT_EQ(seen[1].color1, 0x00FF00u);
        EXPECT_EQ(seen[2].hilite, 3);
        EXPECT_EQ(seen[2].color1, 0xFF0000u);
    }
}

TEST_F(TrackTest, OfHighlightsWithTheSameExtentTheEarlierInTheListWins) {
    for (auto slots : {std::pair<uint16_t, uint16_t>{2, 5}, {5, 2}}) {
        Doc doc(Make({Hilite(slots.first, 1, 3, kGreen), Hilite(slots.second, 1, 3, kBlue)}));
        const std::vector<Colours> seen = WalkColours(this, doc, 1, 3);
        EXPECT_EQ(seen[0].hilite, slots.first);
        EXPECT_EQ(seen[0].color1, 0x00FF00u);
        EXPECT_EQ(seen[1].bits, 0u);
        EXPECT_EQ(seen[2].hilite, AN_NONE);
    }
}

TEST_F(TrackTest, TakingOverClearsTheFlagsTheEarlierStyleSet) {
    // The nested highlight's word has color2 off; the outer one's color2 must not linger.
    Doc doc(Make({Hilite(0, 1, 4, kGreen), Hilite(1, 2, 3, ANSTYLEWORD_NOCOLOR2 | 0xC0)}));
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 1, track), ANTRACK_ACTIVE);
    At(doc, 1, track);
    EXPECT_EQ(track.color2Set, 1u);
    EXPECT_EQ(At(doc, 2, track), ANTRACK_BIT_HILITE);
    EXPECT_EQ(track.color2Set, 0u);
    EXPECT_EQ(track.color1Set, 1u);
}

// ---- Change points and the cursor ---------------------------------------------------------

TEST_F(TrackTest, EntryEndingAtThePositionIsNotReportedThere) {
    // B becomes the cursor at 3 although it ends there; the change point is 3 itself,
    // and the next call at a later position does the full work.
    Doc doc(Make({Hilite(0, 1, 3, kGreen), Point(1, AN_TYPE_POINT, 2, 0, 5),
                  Span(2, AN_TYPE_CUTMARK, 2, 3)}));
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 2, track), ANTRACK_ACTIVE);
    EXPECT_EQ(At(doc, 2, track), ANTRACK_BIT_HILITE | ANTRACK_BIT_POINT | ANTRACK_BIT_CUTMARK);
    EXPECT_EQ(track.cursor, 0);
    EXPECT_EQ(track.nextChange, ANStepAfter(Pos(2)));
    EXPECT_EQ(At(doc, 3, track), ANTRACK_BIT_HILITE | ANTRACK_BIT_CUTMARK)
        << "only what was in force before; nothing covers 3";
    EXPECT_EQ(track.cursor, 2);
    EXPECT_EQ(track.nextChange, Pos(3));
    EXPECT_EQ(track.hiliteEntry, AN_NONE);
    EXPECT_EQ(At(doc, 4, track), 0u);
    EXPECT_EQ(track.cursor, AN_NONE);
    EXPECT_EQ(track.nextChange.itemId, 0xFFFFFFFFu);
}

TEST_F(TrackTest, AFullCallWalksFromTheCursorNotFromTheHead) {
    Doc doc(Make({Point(0, AN_TYPE_POINT, 0, 0, 1), Hilite(1, 5, 7, kRed)}));
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 5, track), ANTRACK_ACTIVE);
    ASSERT_EQ(track.cursor, 1);
    // Were the walk to begin at the head, this entry, behind the cursor, would show.
    auto *state = static_cast<ANInstance *>(antk::annoSlot(doc));
    ANSlot(state->entries, 0).record.end = Pos(9);
    EXPECT_EQ(At(doc, 5, track), ANTRACK_BIT_HILITE);
}

TEST_F(TrackTest, CallsWithoutAStateOrTableReportNothing) {
    Doc doc(PlainDocument(3));
    ANTrackInfo track = Marked();
    track.nextChange = Pos(0);
    const ANTrackInfo before = track;
    EXPECT_EQ(At(nullptr, 1, track), 0u);
    EXPECT_EQ(At(doc, 1, track), 0u) << "no state";
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    EXPECT_EQ(At(doc, 1, track), 0u) << "no table";
    EXPECT_TRUE(Same(track, before));
}

TEST_F(TrackTest, StaleCursorBeyondTheTableIsNotRead) {
    Doc doc(Make({Hilite(0, 1, 3, kRed)}));
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 0, track), ANTRACK_ACTIVE);
    track.cursor = 500;  // from a table that had more slots
    track.hiliteEntry = AN_NONE;
    track.rangeActive = 0;
    // Counted as no cursor: one is found from the head, and, as for any call without
    // a cursor, no entry is examined in this call.
    EXPECT_EQ(At(doc, 2, track), 0u);
    EXPECT_EQ(track.cursor, 0);
    EXPECT_EQ(track.nextChange, Pos(3));
}

TEST_F(TrackTest, AWholeWalkAllocatesNothing) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    Doc doc(Make({Hilite(0, 1, 6, ANSTYLEWORD_NUMBER | 3), Span(1, AN_TYPE_RANGE, 2, 8),
                  Point(2, AN_TYPE_POINT, 4)}));
    const ANHiliteStyle style{ANHILITESTYLE_SIZE, 3, 7, 1, 2, 3, 4, 0};
    ASSERT_EQ(ANAddHiliteStyle(doc, &style), AN_OK);
    anwin::resetCounters();
    ANTrackInfo track = Marked();
    ASSERT_EQ(Start(doc, 0, track), ANTRACK_ACTIVE);
    uint32_t reported = 0;
    for (uint32_t i = 0; i < 10; ++i) reported |= At(doc, i, track);
    EXPECT_EQ(reported, ANTRACK_BIT_HILITE | ANTRACK_BIT_RANGE | ANTRACK_BIT_POINT);
    EXPECT_EQ(anwin::allocations(), 0u);
#endif
}

}  // namespace
