// Starting and ending annotation text tracks, and reading with tracks and documents
// that cannot answer.
#include <gtest/gtest.h>

#include "support/fixture.h"
#include "tracking/text_track.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;
using antk::Fn;

class TextTrackTest : public annotest::LeakCheckedTest {};

bool AllZero(const ANAnnoTextTrack &track) {
    const ANPos zero{};
    return track.segs == nullptr && track.firstPos == zero && track.lastPos == zero;
}

ANAnnoTextTrack Garbage() {
    ANAnnoTextTrack track;
    track.segs = reinterpret_cast<ANTextSegList *>(0x10);
    track.firstPos = ANPos{1, 2, 3, 4};
    track.lastPos = ANPos{5, 6, 7, 8};
    return track;
}

TEST_F(TextTrackTest, StartPreparesAnEmptyListOfFiveFreeSlots) {
    ANAnnoTextTrack track = Garbage();
    ASSERT_EQ(ANStartAnnoTextTrack(nullptr, &track), AN_OK) << "the document is not read";
    ASSERT_NE(track.segs, nullptr);
    EXPECT_EQ(track.firstPos, ANPos{});
    EXPECT_EQ(track.lastPos, ANPos{});
    const ANTextSegList &list = *track.segs;
    EXPECT_EQ(list.segHead, AN_NONE);
    EXPECT_EQ(list.segTail, AN_NONE);
    EXPECT_EQ(list.segFree, 0);
    EXPECT_EQ(list.segCount, 0);
    EXPECT_EQ(list.segCapacity, 5);
    const ANTextSeg *slots = ANTextSegs(track.segs);
    for (uint16_t i = 0; i < 5; ++i) {
        EXPECT_EQ(slots[i].next, i == 4 ? AN_NONE : i + 1) << "slot " << i;
        EXPECT_EQ(slots[i].prev, i == 0 ? AN_NONE : i - 1) << "slot " << i;
    }
    EXPECT_EQ(ANEndAnnoTextTrack(nullptr, &track), AN_OK);
    EXPECT_TRUE(AllZero(track));
}

TEST_F(TextTrackTest, StartOutOfMemoryLeavesTheRecordAllZero) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    ANAnnoTextTrack track = Garbage();
    anwin::failAllocation(1);
    EXPECT_EQ(ANStartAnnoTextTrack(nullptr, &track), AN_ERR_NOMEM);
    EXPECT_TRUE(AllZero(track));
    EXPECT_EQ(ANEndAnnoTextTrack(nullptr, &track), AN_OK) << "ending it does nothing";
    EXPECT_TRUE(AllZero(track));
#endif
}

TEST_F(TextTrackTest, EndingATrackThatIsNotStartedOnlyZeroesIt) {
    ANAnnoTextTrack track{};
    track.firstPos = ANPos{1, 2, 5, 3};
    track.lastPos = ANPos{1, 2, 5, 9};
    EXPECT_EQ(ANEndAnnoTextTrack(nullptr, &track), AN_OK);
    EXPECT_TRUE(AllZero(track));
    EXPECT_EQ(ANEndAnnoTextTrack(nullptr, nullptr), AN_OK);
    EXPECT_EQ(ANStartAnnoTextTrack(nullptr, nullptr), AN_ERR_BADARG);
}

TEST_F(TextTrackTest, ReadingThroughATrackNeverStartedOrAlreadyEndedIsRefused) {
    Doc doc(annotest::PlainDocument(2));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const ANPos pos = TextPos(0, ANPOS_NOSUBITEM, 0);
    uint16_t unit = 0x1234;
    ANAnnoTextTrack never{};
    EXPECT_EQ(ANGetAnnoText(doc, &never, &pos, &unit), AN_ERR_BADARG);
    // A zeroed range names (0, 0, 0, 0); it must not pass for a cached copy either.
    const ANPos zero{};
    EXPECT_EQ(ANGetAnnoText(doc, &never, &zero, &unit), AN_ERR_BADARG);

    ANAnnoTextTrack track{};
    ASSERT_EQ(ANStartAnnoTextTrack(doc, &track), AN_OK);
    ASSERT_EQ(ANEndAnnoTextTrack(doc, &track), AN_OK);
    EXPECT_EQ(ANGetAnnoText(doc, &track, &pos, &unit), AN_ERR_BADARG);
    EXPECT_EQ(ANGetAnnoText(doc, nullptr, &pos, &unit), AN_ERR_BADARG);
    EXPECT_EQ(unit, 0x1234);
}

TEST_F(TextTrackTest, ReadingFromADocumentThatCannotAnswer) {
    Doc doc(annotest::PlainDocument(2));
    ANAnnoTextTrack track{};
    ASSERT_EQ(ANStartAnnoTextTrack(doc, &track), AN_OK);
    const ANPos pos = TextPos(1, ANPOS_NOSUBITEM, 0);
    uint16_t unit = 0x1234;
    EXPECT_EQ(ANGetAnnoText(nullptr, &track, &pos, &unit), AN_ERR_BADARG);
    EXPECT_EQ(ANGetAnnoText(doc, &track, &pos, &unit), AN_ERR_NOSTATE);
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::DAGetAnno, 1, 66);
    EXPECT_EQ(ANGetAnnoText(doc, &track, &pos, &unit), 66u);
    EXPECT_EQ(ANGetAnnoText(doc, &track, &pos, &unit), AN_ERR_NOTFOUND) << "no annotations";
    EXPECT_EQ(track.firstPos, ANPos{});
    EXPECT_EQ(track.lastPos, ANPos{});
    EXPECT_EQ(unit, 0x1234);
    EXPECT_EQ(ANEndAnnoTextTrack(doc, &track), AN_OK);
}

}  // namespace
