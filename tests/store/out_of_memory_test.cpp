// Out of memory at every allocation of insertion: making the table, growing it,
// storing text and splitting a text, with what each failure leaves behind.
#include <gtest/gtest.h>

#include <string>

#include "store/store_steps.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::AddPlaceholder;
using annotest::AddPoint;
using annotest::AddText;
using annotest::AnchorText;
using annotest::Doc;
using annotest::ListedEntries;
using annotest::Notifications;
using annotest::Pos;
using annotest::TableOf;
using annotest::TextPos;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;
const ANPos kAnchor = Pos(7);

class OutOfMemoryTest : public annotest::LeakCheckedTest {
 protected:
#if ANNO_HAVE_PLATFORM_CONTROLS
    // Runs `act` on a document prepared by `setup` once to count its allocations,
    // then once per allocation with that one failing: every failed run gives 13,
    // announces nothing, keeps the table rules and leaks nothing; `check` looks at
    // what it left. Returns the number of allocations.
    template <typename Setup, typename Act, typename Check>
    uint64_t Sweep(Setup setup, Act act, Check check) {
        uint64_t count = 0;
        {
            Doc doc(annotest::PlainDocument(10));
            Notifications notes;
            EXPECT_EQ(ANInit(doc, nullptr, &Notifications::Callback, &notes), AN_OK);
            setup(doc.get());
            anwin::resetCounters();
            EXPECT_EQ(act(doc.get()), AN_OK);
            count = anwin::allocations();
        }
        for (uint64_t n = 1; n <= count; ++n) {
            Doc doc(annotest::PlainDocument(10));
            Notifications notes;
            EXPECT_EQ(ANInit(doc, nullptr, &Notifications::Callback, &notes), AN_OK);
            setup(doc.get());
            notes.calls.clear();
            anwin::failAllocation(n);
            const uint32_t rc = act(doc.get());
            anwin::clearFailures();
            EXPECT_EQ(rc, AN_ERR_NOMEM) << "allocation " << n << " of " << count;
            EXPECT_TRUE(notes.calls.empty()) << "allocation " << n;
            EXPECT_TRUE(annotest::TableInvariantsHold(doc)) << "allocation " << n;
            EXPECT_TRUE(annotest::TextLayoutHolds(doc)) << "allocation " << n;
            check(doc.get(), n);
        }
        return count;
    }
#endif
};

#if ANNO_HAVE_PLATFORM_CONTROLS
void Nothing(DAHandle) {}
#endif

TEST_F(OutOfMemoryTest, FirstEntryLeavesTheDocumentWithoutATable) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    auto noTable = [](DAHandle doc, uint64_t) { EXPECT_EQ(TableOf(doc), nullptr); };
    EXPECT_EQ(Sweep(
                  Nothing, [](DAHandle doc) { return AddText(doc, kAnchor, u"abc"); }, noTable),
              2u)
        << "the text copy and the table";
    EXPECT_EQ(Sweep(
                  Nothing, [](DAHandle doc) { return AddPoint(doc, kAnchor); }, noTable),
              1u);
#endif
}

TEST_F(OutOfMemoryTest, FailedGrowthKeepsTheEntryJustLinked) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    auto eight = [](DAHandle doc) {
        for (uint32_t i = 0; i < 8; ++i) EXPECT_EQ(AddPoint(doc, Pos(i)), AN_OK);
    };
    EXPECT_EQ(Sweep(
                  eight, [](DAHandle doc) { return AddPoint(doc, Pos(8), 9); },
                  [](DAHandle doc, uint64_t) {
                      EXPECT_EQ(TableOf(doc)->count, 9);
                      EXPECT_EQ(TableOf(doc)->capacity, 10);
                      EXPECT_EQ(ListedEntries(doc).back().record.tag, 9u);
                  }),
              1u);
#endif
}

TEST_F(OutOfMemoryTest, NewTextEntryThatCannotCopyItsTextLeavesTheTableAsItWas) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    EXPECT_EQ(Sweep([](DAHandle doc) { EXPECT_EQ(AddPoint(doc, Pos(1)), AN_OK); },
                    [](DAHandle doc) { return AddText(doc, kAnchor, u"abc"); },
                    [](DAHandle doc, uint64_t) { EXPECT_EQ(TableOf(doc)->count, 1); }),
              1u);
#endif
}

// The point at the anchor has moved into the text before the text could grow; that
// stays, and the list stays in document order.
TEST_F(OutOfMemoryTest, TextThatCannotGrowIsUnchangedAndShiftedPositionsStayInOrder) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    const std::u16string full(63, u'a');
    EXPECT_EQ(Sweep(
                  [&full](DAHandle doc) {
                      EXPECT_EQ(AddText(doc, kAnchor, full, 1), AN_OK);
                      EXPECT_EQ(AddPoint(doc, kAnchor, 2), AN_OK);
                  },
                  [](DAHandle doc) { return AddText(doc, kAnchor, u"b"); },
                  [&full](DAHandle doc, uint64_t) {
                      const auto listed = ListedEntries(doc);
                      ASSERT_EQ(listed.size(), 2u);
                      EXPECT_EQ(listed[0].record.tag, 2u);
                      EXPECT_EQ(listed[0].record.start, TextPos(7, kNo, 63));
                      EXPECT_EQ(listed[1].text, full);
                      EXPECT_EQ(listed[1].record.textCapacity, 64u);
                  }),
              1u);
#endif
}

TEST_F(OutOfMemoryTest, TextInsideAFullTextLeavesThatTextUnchanged) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    const std::u16string full(127, u'a');
    EXPECT_EQ(Sweep([&full](DAHandle doc) { EXPECT_EQ(AddText(doc, kAnchor, full), AN_OK); },
                    [](DAHandle doc) { return AddText(doc, TextPos(7, kNo, 5), u"b"); },
                    [&full](DAHandle doc, uint64_t) {
                        EXPECT_EQ(AnchorText(doc, kAnchor), full);
                        EXPECT_EQ(ListedEntries(doc)[0].record.textCapacity, 128u);
                    }),
              1u);
#endif
}

TEST_F(OutOfMemoryTest, SplitWithoutMemoryForTheFirstPartChangesNoText) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    EXPECT_EQ(Sweep([](DAHandle doc) { EXPECT_EQ(AddText(doc, kAnchor, u"123456"), AN_OK); },
                    [](DAHandle doc) { return AddPlaceholder(doc, TextPos(7, kNo, 3)); },
                    [](DAHandle doc, uint64_t) {
                        EXPECT_EQ(TableOf(doc)->count, 1);
                        EXPECT_EQ(AnchorText(doc, kAnchor), u"123456");
                    }),
              1u);
#endif
}

// When the table cannot grow after the first part of a split was linked, the text
// stays in two entries without the placeholder; text added inside the second part
// afterwards still lands there, not behind the first part.
TEST_F(OutOfMemoryTest, SplitWhoseGrowthFailsKeepsTheTextInTwoParts) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    auto setup = [](DAHandle doc) {
        for (uint32_t i = 0; i < 7; ++i) EXPECT_EQ(AddPoint(doc, Pos(i)), AN_OK);
        EXPECT_EQ(AddText(doc, kAnchor, u"123456"), AN_OK);
    };
    EXPECT_EQ(Sweep(
                  setup, [](DAHandle doc) { return AddPlaceholder(doc, TextPos(7, kNo, 3)); },
                  [](DAHandle doc, uint64_t n) {
                      EXPECT_EQ(AnchorText(doc, kAnchor), u"123456");
                      if (n == 1) {
                          EXPECT_EQ(TableOf(doc)->count, 8);
                          return;
                      }
                      EXPECT_EQ(TableOf(doc)->count, 9) << "the first part stays";
                      EXPECT_EQ(ListedEntries(doc)[7].text, u"123");
                      ADD_OK(AddText(doc, TextPos(7, kNo, 4), u"Z"));
                      EXPECT_EQ(AnchorText(doc, kAnchor), u"1234Z56");
                      EXPECT_EQ(TableOf(doc)->capacity, 20) << "grown before the last slot";
                  }),
              2u);
#endif
}

}  // namespace
