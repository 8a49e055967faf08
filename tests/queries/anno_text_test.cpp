// Reading annotation text unit by unit through a text track: the per-anchor copy,
// when it is rebuilt, and running out of memory while it is built.
#include <gtest/gtest.h>

#include <set>

#include "support/add_helpers.h"
#include "support/fixture.h"
#include "tracking/text_track.h"
#include "walking/walk_support.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;
using antk::Fn;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;
constexpr uint32_t kUnit = 5;
constexpr uint32_t kPlaceholder = 6;

class AnnoTextTest : public annotest::LeakCheckedTest {};

// A started track, ended when it goes out of scope.
class Track {
 public:
    Track() { EXPECT_EQ(ANStartAnnoTextTrack(nullptr, &track_), AN_OK); }
    ~Track() { ANEndAnnoTextTrack(nullptr, &track_); }
    Track(const Track &) = delete;
    Track &operator=(const Track &) = delete;
    ANAnnoTextTrack *get() { return &track_; }
    ANAnnoTextTrack *operator->() { return &track_; }

 private:
    ANAnnoTextTrack track_{};
};

struct Read {
    uint32_t code;
    uint16_t unit;
};

Read ReadAt(DAHandle doc, Track &track, ANPos pos) {
    Read read{0, 0xEEEE};
    read.code = ANGetAnnoText(doc, track.get(), &pos, &read.unit);
    return read;
}

// Every slot in exactly one of the two lists, the count that of the used list, and
// the used list linked both ways.
::testing::AssertionResult SegListSound(const ANAnnoTextTrack &track) {
    if (track.segs == nullptr) return ::testing::AssertionFailure() << "no list";
    const ANTextSegList &list = *track.segs;
    const ANTextSeg *slots = ANTextSegs(track.segs);
    std::set<uint16_t> seen;
    uint16_t prev = AN_NONE;
    uint32_t used = 0;
    for (uint16_t i = list.segHead; i != AN_NONE; i = slots[i].next, ++used) {
        if (i >= list.segCapacity || !seen.insert(i).second || slots[i].prev != prev) {
            return ::testing::AssertionFailure() << "used list broken at slot " << i;
        }
        prev = i;
    }
    if (prev != list.segTail) return ::testing::AssertionFailure() << "segTail is not the last";
    if (used != list.segCount) {
        return ::testing::AssertionFailure() << "segCount " << list.segCount << ", used " << used;
    }
    for (uint16_t i = list.segFree; i != AN_NONE; i = slots[i].next) {
        if (i >= list.segCapacity || !seen.insert(i).second) {
            return ::testing::AssertionFailure() << "free list broken at slot " << i;
        }
    }
    if (seen.size() != list.segCapacity) {
        return ::testing::AssertionFailure()
               << seen.size() << " of " << list.segCapacity << " slots are in a list";
    }
    return ::testing::AssertionSuccess();
}

class AnnoTextDocTest : public AnnoTextTest {
 protected:
    void SetUp() override {
        AnnoTextTest::SetUp();
        antk::DocumentBuilder builder;
        plain_ = builder.item(antk::kItemParagraph);
        text_ = builder.textItem("abc");  // characters 0, 1, 2
        other_ = builder.item(antk::kItemParagraph);
        doc_ = builder.build();
        ASSERT_EQ(ANInit(doc_, nullptr, nullptr, nullptr), AN_OK);
    }
    void TearDown() override {
        ANDeInit(doc_);
        antk::destroyDocument(doc_);
        AnnoTextTest::TearDown();
    }

    // At (other_): "ab", a placeholder, "cde".
    void AddMixedText() {
        ASSERT_EQ(annotest::AddText(doc_, Pos(other_), u"ab"), AN_OK);
        ASSERT_EQ(annotest::AddPlaceholder(doc_, Pos(other_)), AN_OK);
        ASSERT_EQ(annotest::AddText(doc_, Pos(other_), u"cde"), AN_OK);
    }

    DAHandle doc_ = nullptr;
    uint32_t plain_ = 0;
    uint32_t text_ = 0;
    uint32_t other_ = 0;
};

TEST_F(AnnoTextDocTest, ReadsEveryUnitOfAnAnchorInListOrder) {
    AddMixedText();
    Track track;
    const Read expected[] = {{kUnit, u'a'}, {kUnit, u'b'}, {kPlaceholder, 0},
                             {kUnit, u'c'}, {kUnit, u'd'}, {kUnit, u'e'}};
    for (uint32_t i = 0; i < 6; ++i) {
        const Read read = ReadAt(doc_, track, TextPos(other_, kNo, i));
        EXPECT_EQ(read.code, expected[i].code) << "index " << i;
        EXPECT_EQ(read.unit, expected[i].unit) << "index " << i;
    }
    const Read beyond = ReadAt(doc_, track, TextPos(other_, kNo, 6));
    EXPECT_EQ(beyond.code, AN_ERR_NOTFOUND);
    EXPECT_EQ(beyond.unit, 0xEEEE) << "the unit is not written";
    EXPECT_EQ(track->firstPos, TextPos(other_, kNo, 0));
    EXPECT_EQ(track->lastPos, TextPos(other_, kNo, 5));
    EXPECT_EQ(track->segs->segCount, 3);
    EXPECT_TRUE(SegListSound(*track.get()));
}

TEST_F(AnnoTextDocTest, ReadsWithinTheCachedAnchorDoNotLookAtTheDocumentAgain) {
    AddMixedText();
    Track track;
    ASSERT_EQ(ReadAt(doc_, track, TextPos(other_, kNo, 0)).code, kUnit);
    antk::resetCalls();
    for (uint32_t i = 1; i < 6; ++i) ReadAt(doc_, track, TextPos(other_, kNo, i));
    ReadAt(doc_, track, TextPos(other_, kNo, 3));
    EXPECT_EQ(antk::calls(Fn::DAGetAnno), 0u);
    // The cache answers even when the document could not.
    antk::failCall(Fn::DAGetAnno, 1, 99, true);
    EXPECT_EQ(ReadAt(doc_, track, TextPos(other_, kNo, 4)).unit, u'd');
    antk::clearFailures();
    // A null document is refused before the cache is looked at.
    const ANPos pos = TextPos(other_, kNo, 0);
    uint16_t unit = 0;
    EXPECT_EQ(ANGetAnnoText(nullptr, track.get(), &pos, &unit), AN_ERR_BADARG);
}

TEST_F(AnnoTextDocTest, AnotherAnchorRebuildsTheCopy) {
    AddMixedText();
    ASSERT_EQ(annotest::AddText(doc_, Pos(text_, 1), u"XY"), AN_OK);
    Track track;
    EXPECT_EQ(ReadAt(doc_, track, TextPos(other_, kNo, 1)).unit, u'b');
    antk::resetCalls();
    EXPECT_EQ(ReadAt(doc_, track, TextPos(text_, 1, 1)).unit, u'Y');
    EXPECT_EQ(antk::calls(Fn::DAGetAnno), 1u);
    EXPECT_EQ(track->firstPos, TextPos(text_, 1, 0));
    EXPECT_EQ(track->lastPos, TextPos(text_, 1, 1));
    EXPECT_EQ(track->segs->segCount, 1);
    EXPECT_TRUE(SegListSound(*track.get()));
    EXPECT_EQ(ReadAt(doc_, track, TextPos(other_, kNo, 5)).unit, u'e');
    EXPECT_EQ(antk::calls(Fn::DAGetAnno), 2u);
    EXPECT_EQ(track->segs->segCount, 3);
    EXPECT_TRUE(SegListSound(*track.get()));
}

TEST_F(AnnoTextDocTest, PositionsWithoutTextGiveNotFound) {
    AddMixedText();
    Track track;
    // A content position at an anchor with text caches that text and finds no unit.
    Read read = ReadAt(doc_, track, Pos(other_));
    EXPECT_EQ(read.code, AN_ERR_NOTFOUND);
    EXPECT_EQ(read.unit, 0xEEEE);
    EXPECT_EQ(track->firstPos, TextPos(other_, kNo, 0));
    // An anchor without text leaves nothing cached.
    read = ReadAt(doc_, track, TextPos(plain_, kNo, 0));
    EXPECT_EQ(read.code, AN_ERR_NOTFOUND);
    EXPECT_EQ(track->firstPos, ANPos{});
    EXPECT_EQ(track->lastPos, ANPos{});
    EXPECT_EQ(track->segs->segCount, 0);
    EXPECT_TRUE(SegListSound(*track.get()));
}

TEST_F(AnnoTextDocTest, AnEmptyTextCoversEveryIndexAndFindsNothing) {
    ASSERT_EQ(annotest::AddText(doc_, Pos(plain_), u""), AN_OK);
    Track track;
    EXPECT_EQ(ReadAt(doc_, track, TextPos(plain_, kNo, 0)).code, AN_ERR_NOTFOUND);
    EXPECT_EQ(track->lastPos, TextPos(plain_, kNo, 0xFFFFFFFF));
    antk::resetCalls();
    EXPECT_EQ(ReadAt(doc_, track, TextPos(plain_, kNo, 7)).code, AN_ERR_NOTFOUND);
    EXPECT_EQ(ReadAt(doc_, track, TextPos(plain_, kNo, 0xFFFFFFFF)).code, AN_ERR_NOTFOUND);
    EXPECT_EQ(antk::calls(Fn::DAGetAnno), 0u) << "no rebuild";
}

// Text at (i, 0xFFFFFFFF) and at (i, 0) sorts as one anchor, but each is its own
// text: the answer must not depend on which one was read first.
TEST_F(AnnoTextDocTest, TextOnTheItemAndOnItsFirstCharacterAreReadApart) {
    ASSERT_EQ(annotest::AddText(doc_, Pos(text_, kNo), u"I"), AN_OK);
    ASSERT_EQ(annotest::AddText(doc_, Pos(text_, 0), u"Z"), AN_OK);
    Track track;
    EXPECT_EQ(ReadAt(doc_, track, TextPos(text_, kNo, 0)).unit, u'I');
    EXPECT_EQ(ReadAt(doc_, track, TextPos(text_, 0, 0)).unit, u'Z');
    EXPECT_EQ(ReadAt(doc_, track, TextPos(text_, kNo, 0)).unit, u'I');
}

// "a", placeholder, "b", placeholder, "c": the fifth segment grows the list.
class AnnoTextGrowthTest : public AnnoTextDocTest {
 protected:
    void AddFiveSegments() {
        ASSERT_EQ(annotest::AddText(doc_, Pos(other_), u"a"), AN_OK);
        ASSERT_EQ(annotest::AddPlaceholder(doc_, Pos(other_)), AN_OK);
        ASSERT_EQ(annotest::AddText(doc_, Pos(other_), u"b"), AN_OK);
        ASSERT_EQ(annotest::AddPlaceholder(doc_, Pos(other_)), AN_OK);
        ASSERT_EQ(annotest::AddText(doc_, Pos(other_), u"c"), AN_OK);
    }
};

TEST_F(AnnoTextGrowthTest, TheFifthSegmentGrowsTheListByFive) {
    AddFiveSegments();
    Track track;
    const Read read = ReadAt(doc_, track, TextPos(other_, kNo, 4));
    EXPECT_EQ(read.code, kUnit);
    EXPECT_EQ(read.unit, u'c');
    EXPECT_EQ(track->segs->segCapacity, 10);
    EXPECT_EQ(track->segs->segCount, 5);
    EXPECT_TRUE(SegListSound(*track.get()));
    // Released slots are reused: another rebuild does not grow the list again.
    ReadAt(doc_, track, TextPos(plain_, kNo, 0));
    ReadAt(doc_, track, TextPos(other_, kNo, 0));
    EXPECT_EQ(track->segs->segCapacity, 10);
    EXPECT_TRUE(SegListSound(*track.get()));
}

TEST_F(AnnoTextGrowthTest, OutOfMemoryKeepsTheSegmentsGatheredAndLeaksNothing) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    AddFiveSegments();
    uint64_t needed = 0;
    {
        Track track;
        anwin::resetCounters();
        ASSERT_EQ(ReadAt(doc_, track, TextPos(other_, kNo, 0)).code, kUnit);
        needed = anwin::allocations();
    }
    ASSERT_EQ(needed, 4u) << "three text copies and one growth";
    // Allocations: "a", "b", the growth before the fifth segment, "c".
    const uint32_t gathered[] = {0, 2, 4, 4};
    for (uint64_t n = 1; n <= needed; ++n) {
        SCOPED_TRACE(n);
        Track track;
        anwin::failAllocation(n);
        EXPECT_EQ(ReadAt(doc_, track, TextPos(other_, kNo, 4)).code, AN_ERR_NOMEM);
        ASSERT_NE(track->segs, nullptr);
        EXPECT_TRUE(SegListSound(*track.get()));
        const uint32_t units = gathered[n - 1];
        EXPECT_EQ(track->segs->segCount, units);
        if (units == 0) {
            EXPECT_EQ(track->lastPos, ANPos{});
        } else {
            EXPECT_EQ(track->lastPos, TextPos(other_, kNo, units - 1));
            const Read first = ReadAt(doc_, track, TextPos(other_, kNo, 0));
            EXPECT_EQ(first.unit, u'a') << "what was gathered reads as before";
        }
        // The fifth unit lies outside the range: the next read rebuilds and finds it.
        const Read fifth = ReadAt(doc_, track, TextPos(other_, kNo, 4));
        EXPECT_EQ(fifth.code, kUnit);
        EXPECT_EQ(fifth.unit, u'c');
        EXPECT_TRUE(SegListSound(*track.get()));
    }
#endif
}

}  // namespace
