// Delivering input events to the annotations at a position: click-like events, moves
// turned into leave and enter events, the hover state, and slot indices that name
// no entry.
#include <gtest/gtest.h>

#include <vector>

#include "binding/instance.h"
#include "store/table.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "walking/walk_support.h"

namespace {

using annotest::Doc;
using annotest::Pos;

class EventTest : public annotest::LeakCheckedTest {};

struct Delivery {
    uint32_t code;
    uint16_t wanted;
    uint32_t event;
    uint32_t tag;
    uint64_t userData;
};

// Records every notification 3 and answers with the next of `results` (then 0).
struct Recorder {
    std::vector<Delivery> seen;
    std::vector<uint32_t> results;
    uint32_t badSize = 0;

    static uint32_t Callback(uint16_t code, uint16_t detail, void *record, void *data) {
        auto *self = static_cast<Recorder *>(data);
        if (code != ANNOTIFY_EVENT) return 0;  // additions
        const auto *rec = static_cast<const ANEventRec *>(record);
        if (rec->size != ANEVENTREC_SIZE) ++self->badSize;
        self->seen.push_back(Delivery{code, detail, rec->event, rec->tag, rec->userData});
        const size_t n = self->seen.size() - 1;
        return n < self->results.size() ? self->results[n] : 0;
    }
};

ANInstance *StateOf(DAHandle doc) { return static_cast<ANInstance *>(antk::annoSlot(doc)); }

uint16_t SlotOf(DAHandle doc, uint32_t tag) {
    const ANEntryTable *table = StateOf(doc)->entries;
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        if (ANSlot(table, i).record.tag == tag) return i;
    }
    ADD_FAILURE() << "no entry with tag " << tag;
    return AN_NONE;
}

// The (event, tag) pairs seen, in order.
std::vector<std::pair<uint32_t, uint32_t>> Events(const Recorder &recorder) {
    std::vector<std::pair<uint32_t, uint32_t>> events;
    for (const Delivery &d : recorder.seen) events.emplace_back(d.event, d.tag);
    return events;
}

using EventList = std::vector<std::pair<uint32_t, uint32_t>>;

constexpr uint32_t kA = 1;  // highlight over items 2 to 5, wants click 1 and enter
constexpr uint32_t kB = 2;  // highlight over items 4 to 7, wants nothing
constexpr uint32_t kC = 3;  // point on item 5, wants click 2 and leave

// Ten plain items and the three annotations above, with a recorder as callback.
class EventDocTest : public EventTest {
 protected:
    void SetUp() override {
        EventTest::SetUp();
        doc_ = annotest::PlainDocument(10);
        ASSERT_EQ(ANInit(doc_, nullptr, Recorder::Callback, &recorder_), AN_OK);
        ASSERT_EQ(
            annotest::AddHilite(doc_, Pos(2), Pos(6), kA, 0, 0xA0, ANEVENT_CLICK1 | ANEVENT_ENTER),
            AN_OK);
        ASSERT_EQ(annotest::AddHilite(doc_, Pos(4), Pos(8), kB, 0, 0xB0), AN_OK);
        ASSERT_EQ(annotest::AddPoint(doc_, Pos(5), kC, 0, AN_TYPE_POINT,
                                     ANEVENT_CLICK2 | ANEVENT_LEAVE, 0xC0),
                  AN_OK);
        recorder_.seen.clear();
    }
    void TearDown() override {
        ANDeInit(doc_);
        antk::destroyDocument(doc_);
        EventTest::TearDown();
    }

    uint32_t Event(uint32_t event, uint16_t entry, ANPos pos) {
        return ANAnnoEvent(doc_, event, entry, &pos);
    }

    DAHandle doc_ = nullptr;
    Recorder recorder_;
};

TEST_F(EventDocTest, AClickReachesEveryAnnotationUnderThePositionInListOrder) {
    recorder_.results = {7, 9, 11};
    EXPECT_EQ(Event(ANEVENT_CLICK2, SlotOf(doc_, kA), Pos(5)), 11u) << "the last result";
    EXPECT_EQ(Events(recorder_), (EventList{{2, kA}, {2, kB}, {2, kC}}));
    ASSERT_EQ(recorder_.seen.size(), 3u);
    EXPECT_EQ(recorder_.seen[0].code, ANNOTIFY_EVENT);
    EXPECT_EQ(recorder_.seen[0].wanted, 0) << "A does not take click 2, but hears of it";
    EXPECT_EQ(recorder_.seen[2].wanted, 1);
    EXPECT_EQ(recorder_.seen[1].userData, 0xB0u);
    EXPECT_EQ(recorder_.badSize, 0u);

    recorder_.seen.clear();
    recorder_.results = {4, 0};
    EXPECT_EQ(Event(ANEVENT_CLICK1, SlotOf(doc_, kA), Pos(5, 0)), 0u)
        << "a last callback result of 0 is the result";
    EXPECT_EQ(Events(recorder_), (EventList{{1, kA}, {1, kB}}));
    EXPECT_EQ(recorder_.seen[0].wanted, 1);
}

TEST_F(EventDocTest, AClickWalksOnlyFromTheEntryGivenAndNotOverAnEnd) {
    EXPECT_EQ(Event(ANEVENT_CLICK3, SlotOf(doc_, kB), Pos(5)), 0u);
    EXPECT_EQ(Events(recorder_), (EventList{{0x20, kB}, {0x20, kC}})) << "A lies before B";
    recorder_.seen.clear();
    Event(ANEVENT_CLICK1, SlotOf(doc_, kA), Pos(6));
    EXPECT_EQ(Events(recorder_), (EventList{{1, kB}})) << "A ends where the click is";
    recorder_.seen.clear();
    Event(ANEVENT_CLICK1, SlotOf(doc_, kA), Pos(1));
    EXPECT_TRUE(recorder_.seen.empty()) << "the click lies before the first entry";
    EXPECT_EQ(Event(ANEVENT_CLICK1, AN_NONE, Pos(5)), 0u);
    EXPECT_TRUE(recorder_.seen.empty());
}

TEST_F(EventDocTest, TheCursorOfATrackingWalkIsWhereEventsStart) {
    ANTrackInfo track{};
    const ANPos at = Pos(7);
    ASSERT_EQ(ANStartAnnoTrack(doc_, &at, &track), ANTRACK_ACTIVE);
    Event(ANEVENT_CLICK1, track.cursor, at);
    EXPECT_EQ(Events(recorder_), (EventList{{1, kB}}));
}

TEST_F(EventDocTest, CodesThatAreNotEventsDeliverNothing) {
    for (const uint32_t code : {0u, 3u, ANEVENT_ENTER, ANEVENT_LEAVE, 0x40u, 0x11u}) {
        EXPECT_EQ(Event(code, SlotOf(doc_, kA), Pos(5)), 0u) << code;
    }
    EXPECT_TRUE(recorder_.seen.empty());
    EXPECT_EQ(StateOf(doc_)->hoverEntry, AN_NONE);
}

TEST_F(EventDocTest, MovesBecomeEnterAndLeaveEventsAgainstTheLastMove) {
    const uint16_t a = SlotOf(doc_, kA);
    const uint16_t b = SlotOf(doc_, kB);
    // The first move: enters everything under the position, leaves nothing.
    recorder_.results = {1, 2, 3};
    EXPECT_EQ(Event(ANEVENT_MOVE, a, Pos(5)), 3u);
    EXPECT_EQ(Events(recorder_), (EventList{{4, kA}, {4, kB}, {4, kC}}));
    EXPECT_EQ(recorder_.seen[0].wanted, 1);
    EXPECT_EQ(recorder_.seen[1].wanted, 0);
    EXPECT_EQ(StateOf(doc_)->hoverEntry, a);
    EXPECT_EQ(StateOf(doc_)->hoverPos, Pos(5));

    // Still inside A and B: only C is left.
    recorder_.seen.clear();
    Event(ANEVENT_MOVE, a, Pos(4));
    EXPECT_EQ(Events(recorder_), (EventList{{8, kC}}));
    EXPECT_EQ(recorder_.seen[0].wanted, 1);

    // Back onto C, and off it again into B alone.
    recorder_.seen.clear();
    Event(ANEVENT_MOVE, b, Pos(5));
    EXPECT_EQ(Events(recorder_), (EventList{{4, kC}}));
    recorder_.seen.clear();
    Event(ANEVENT_MOVE, b, Pos(7));
    EXPECT_EQ(Events(recorder_), (EventList{{8, kC}}));
    // From B alone into A alone: the leave comes before the enter.
    recorder_.seen.clear();
    Event(ANEVENT_MOVE, a, Pos(3));
    EXPECT_EQ(Events(recorder_), (EventList{{8, kB}, {4, kA}}));
}

TEST_F(EventDocTest, MovingOutOfEveryAnnotationLeavesThemAndForgetsTheEntry) {
    const uint16_t a = SlotOf(doc_, kA);
    Event(ANEVENT_MOVE, a, Pos(5));
    recorder_.seen.clear();
    Event(ANEVENT_MOVE, AN_NONE, Pos(9));
    EXPECT_EQ(Events(recorder_), (EventList{{8, kA}, {8, kB}, {8, kC}}));
    EXPECT_EQ(StateOf(doc_)->hoverEntry, AN_NONE);
    EXPECT_EQ(StateOf(doc_)->hoverPos, Pos(9));

    // With no entry now and none before, a move changes nothing at all.
    recorder_.seen.clear();
    EXPECT_EQ(Event(ANEVENT_MOVE, AN_NONE, Pos(1)), 0u);
    EXPECT_TRUE(recorder_.seen.empty());
    EXPECT_EQ(StateOf(doc_)->hoverPos, Pos(9));

    // Click-like events leave the hover state alone.
    Event(ANEVENT_CLICK1, a, Pos(3));
    EXPECT_EQ(StateOf(doc_)->hoverEntry, AN_NONE);
    EXPECT_EQ(StateOf(doc_)->hoverPos, Pos(9));
}

TEST_F(EventDocTest, WithoutACallbackTheHoverStateStillFollowsMoves) {
    ASSERT_EQ(ANSetCallback(doc_, nullptr, nullptr), AN_OK);
    const uint16_t b = SlotOf(doc_, kB);
    EXPECT_EQ(Event(ANEVENT_MOVE, b, Pos(6)), 0u);
    EXPECT_EQ(StateOf(doc_)->hoverEntry, b);
    EXPECT_EQ(StateOf(doc_)->hoverPos, Pos(6));
    EXPECT_EQ(Event(ANEVENT_CLICK1, b, Pos(6)), 0u);
    EXPECT_TRUE(recorder_.seen.empty());
}

// A slot index beyond the table or on its free list names no entry: walking from it
// would read outside the table or follow the free list.
TEST_F(EventDocTest, AnIndexThatNamesNoEntryDeliversNothing) {
    const ANEntryTable *table = StateOf(doc_)->entries;
    ASSERT_EQ(table->capacity, 10);
    const uint16_t freeSlot = table->freeFirst;
    for (const uint16_t bad : {freeSlot, uint16_t{9}, uint16_t{10}, uint16_t{500}}) {
        SCOPED_TRACE(bad);
        EXPECT_EQ(Event(ANEVENT_CLICK1, bad, Pos(5)), 0u);
        EXPECT_EQ(Event(ANEVENT_MOVE, bad, Pos(5)), 0u);
        EXPECT_TRUE(recorder_.seen.empty());
        EXPECT_EQ(StateOf(doc_)->hoverEntry, AN_NONE) << "the hover state is not touched";
    }
}

TEST_F(EventDocTest, AHoverEntryThatNoLongerNamesAnEntryIsNotLeft) {
    const uint16_t freeSlot = StateOf(doc_)->entries->freeFirst;
    for (const uint16_t stale : {uint16_t{600}, freeSlot}) {
        SCOPED_TRACE(stale);
        recorder_.seen.clear();
        StateOf(doc_)->hoverEntry = stale;
        StateOf(doc_)->hoverPos = Pos(1);
        Event(ANEVENT_MOVE, SlotOf(doc_, kB), Pos(7));
        EXPECT_EQ(Events(recorder_), (EventList{{4, kB}}));
        EXPECT_EQ(StateOf(doc_)->hoverEntry, SlotOf(doc_, kB));
    }
}

TEST_F(EventTest, DocumentsWithoutAnnotationsAnswerZero) {
    Doc doc(annotest::PlainDocument(3));
    const ANPos pos = Pos(1);
    EXPECT_EQ(ANAnnoEvent(nullptr, ANEVENT_CLICK1, 0, &pos), 0u);
    EXPECT_EQ(ANAnnoEvent(doc, ANEVENT_CLICK1, 0, &pos), 0u) << "no annotation state";
    Recorder recorder;
    ASSERT_EQ(ANInit(doc, nullptr, Recorder::Callback, &recorder), AN_OK);
    EXPECT_EQ(ANAnnoEvent(doc, ANEVENT_MOVE, 0, &pos), 0u) << "no table";
    EXPECT_EQ(StateOf(doc)->hoverEntry, AN_NONE);
    ASSERT_EQ(annotest::AddHilite(doc, Pos(0), Pos(2), 5), AN_OK);
    recorder.seen.clear();
    recorder.results = {42};
    antk::failCall(antk::Fn::DAGetAnno, 1, 31);
    EXPECT_EQ(ANAnnoEvent(doc, ANEVENT_CLICK1, 0, &pos), 0u);
    EXPECT_EQ(ANAnnoEvent(doc, ANEVENT_CLICK1, 0, &pos), 42u);
    EXPECT_EQ(ANAnnoEvent(doc, ANEVENT_CLICK1, 0, nullptr), 0u);
}

}  // namespace
