// Range splitting when memory or the sibling modules fail: the pieces and markers
// added before a failure stay, the failure is returned without notification, steps
// that fail end every walk, and nothing leaks.
#include <gtest/gtest.h>

#include <algorithm>
#include <set>
#include <string>
#include <vector>

#include "range_support.h"

namespace {

using annotest::AddPlaceholder;
using annotest::AddRange;
using annotest::Doc;
using annotest::ListedEntries;
using annotest::Pos;
using annotest::TableOf;
using rangetest::Mark;
using rangetest::Range;
using rangetest::Stored;
using rangetest::StoredEntries;
using Fn = antk::Fn;

using FailureTest = rangetest::RangeTest;

constexpr const char *kExample = "...Sc..c..";
constexpr uint32_t kCode = 77;

// The worked example's entries in the order they are added.
const std::vector<Stored> &ExampleEntries() {
    static const std::vector<Stored> entries{Range(1, 3), Mark(4), Range(5, 7), Mark(7)};
    return entries;
}

// The entries in the order they were added (slot order: the table was new).
std::vector<Stored> InAddOrder(DAHandle doc) {
    std::vector<std::pair<uint16_t, Stored>> bySlot;
    for (const auto &e : ListedEntries(doc)) {
        bySlot.push_back({e.slot, Stored{e.type, e.record.start, e.record.end}});
    }
    std::sort(bySlot.begin(), bySlot.end(),
              [](const auto &a, const auto &b) { return a.first < b.first; });
    std::vector<Stored> stored;
    for (const auto &s : bySlot) stored.push_back(s.second);
    return stored;
}

bool IsPrefix(const std::vector<Stored> &part, const std::vector<Stored> &whole) {
    return part.size() <= whole.size() && std::equal(part.begin(), part.end(), whole.begin());
}

TEST_F(FailureTest, OutOfMemoryAtTheTextTrackAddsNothing) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    Doc doc(NewDoc(kExample));
    anwin::failAllocation(1);
    EXPECT_ADD(AN_ERR_NOMEM, AddRange(doc, Pos(1), Pos(8)));
    anwin::clearFailures();
    EXPECT_EQ(TableOf(doc), nullptr);
    EXPECT_TRUE(notes.calls.empty());
#endif
}

// Every allocation of the worked example fails in turn: the code comes back with the
// entries added before it, without notification.
TEST_F(FailureTest, OutOfMemoryKeepsWhatWasAddedBefore) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    uint64_t count = 0;
    {
        Doc doc(NewDoc(kExample));
        anwin::resetCounters();
        ADD_OK(AddRange(doc, Pos(1), Pos(8)));
        count = anwin::allocations();
    }
    ASSERT_GT(count, 0u);
    std::set<size_t> kept;
    for (uint64_t n = 1; n <= count; ++n) {
        Doc doc(NewDoc(kExample));
        notes.calls.clear();
        anwin::failAllocation(n);
        EXPECT_EQ(AddRange(doc, Pos(1), Pos(8)), AN_ERR_NOMEM) << "allocation " << n;
        anwin::clearFailures();
        EXPECT_TRUE(annotest::TableInvariantsHold(doc)) << "allocation " << n;
        const auto stored = InAddOrder(doc);
        EXPECT_TRUE(IsPrefix(stored, ExampleEntries())) << "allocation " << n;
        EXPECT_TRUE(notes.calls.empty()) << "allocation " << n;
        kept.insert(stored.size());
    }
    EXPECT_TRUE(kept.count(2)) << "a failure while adding the second piece keeps the first "
                                  "piece and its marker";
#endif
}

// Text reading, several pieces and the growth of the table during the walk, each
// allocation failing in turn: a failure is either returned or, in reading annotation
// text, costs a cut; the table stays whole.
TEST_F(FailureTest, OutOfMemoryWithTextAndGrowthKeepsTheTableWhole) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    const char *layout = "..c..c..c..c..c..c..";
    auto prepare = [&](DAHandle doc) {
        ADD_OK(annotest::AddText(doc, Pos(1), u"ab"));
        ADD_OK(AddPlaceholder(doc, Pos(7)));
        notes.calls.clear();
    };
    uint64_t count = 0;
    {
        Doc doc(NewDoc(layout));
        prepare(doc);
        anwin::resetCounters();
        ADD_OK(AddRange(doc, Pos(0), Pos(19)));
        count = anwin::allocations();
        EXPECT_GT(TableOf(doc)->capacity, 10) << "the table grew during the walk";
    }
    for (uint64_t n = 1; n <= count; ++n) {
        Doc doc(NewDoc(layout));
        prepare(doc);
        anwin::failAllocation(n);
        const uint32_t rc = AddRange(doc, Pos(0), Pos(19));
        anwin::clearFailures();
        EXPECT_TRUE(rc == AN_OK || rc == AN_ERR_NOMEM) << "allocation " << n << ": " << rc;
        EXPECT_TRUE(annotest::TableInvariantsHold(doc)) << "allocation " << n;
        EXPECT_EQ(notes.calls.size(), rc == AN_OK ? 1u : 0u) << "allocation " << n;
    }
#endif
}

// DAGetAnno failing at each call: the code is returned with the entries added before.
TEST_F(FailureTest, DataAccessFailureKeepsWhatWasAddedBefore) {
    uint64_t count = 0;
    {
        Doc doc(NewDoc(kExample));
        antk::resetCalls();
        ADD_OK(AddRange(doc, Pos(1), Pos(8)));
        count = antk::calls(Fn::DAGetAnno);
    }
    std::set<size_t> kept;
    for (uint64_t n = 1; n <= count; ++n) {
        Doc doc(NewDoc(kExample));
        notes.calls.clear();
        antk::failCall(Fn::DAGetAnno, n, kCode);
        const uint32_t rc = AddRange(doc, Pos(1), Pos(8));
        antk::clearFailures();
        EXPECT_TRUE(annotest::TableInvariantsHold(doc)) << "call " << n;
        if (rc == AN_OK) {
            EXPECT_EQ(notes.calls.size(), 1u) << "call " << n;
            continue;
        }
        EXPECT_EQ(rc, kCode) << "call " << n;
        EXPECT_TRUE(notes.calls.empty()) << "call " << n;
        const auto stored = InAddOrder(doc);
        EXPECT_TRUE(IsPrefix(stored, ExampleEntries())) << "call " << n;
        kept.insert(stored.size());
    }
    EXPECT_EQ(kept, (std::set<size_t>{0, 1, 2, 3}))
        << "failing the add itself or the first piece, then each later piece or marker";
}

// The chunker failing while the second piece is added (in its own trimming and walk,
// and in the walk after it): the first piece and its marker stay, and the range is
// still added once.
TEST_F(FailureTest, ChunkerFailureWhileAddingTheSecondPieceKeepsTheFirst) {
    // How many calls come before the second piece's own add: the DAGetAnno failure
    // that stops there leaves two entries.
    uint64_t secondPieceCall = 0;
    for (uint64_t n = 1; secondPieceCall == 0 && n < 1000; ++n) {
        Doc doc(NewDoc(kExample));
        antk::failCall(Fn::DAGetAnno, n, kCode);
        const uint32_t rc = AddRange(doc, Pos(1), Pos(8));
        antk::clearFailures();
        if (rc == kCode && StoredEntries(doc).size() == 2) secondPieceCall = n;
    }
    ASSERT_NE(secondPieceCall, 0u);

    for (Fn fn : {Fn::CHGetItem, Fn::CHNextItemId}) {
        uint64_t before = 0, total = 0;
        {
            Doc doc(NewDoc(kExample));
            antk::resetCalls();
            antk::failCall(Fn::DAGetAnno, secondPieceCall, kCode);
            AddRange(doc, Pos(1), Pos(8));
            antk::clearFailures();
            before = antk::calls(fn);
        }
        {
            Doc doc(NewDoc(kExample));
            antk::resetCalls();
            ADD_OK(AddRange(doc, Pos(1), Pos(8)));
            total = antk::calls(fn);
        }
        ASSERT_LT(before, total);
        for (uint64_t n = before + 1; n <= total; ++n) {
            Doc doc(NewDoc(kExample));
            notes.calls.clear();
            antk::failCall(fn, n, kCode);
            ADD_OK(AddRange(doc, Pos(1), Pos(8)));
            antk::clearFailures();
            const auto stored = InAddOrder(doc);
            ASSERT_GE(stored.size(), 2u) << antk::fnName(fn) << " call " << n;
            EXPECT_EQ(stored[0], Range(1, 3)) << antk::fnName(fn) << " call " << n;
            EXPECT_EQ(stored[1], Mark(4)) << antk::fnName(fn) << " call " << n;
            EXPECT_EQ(notes.calls.size(), 1u) << antk::fnName(fn) << " call " << n;
        }
    }
}

// Whatever chunker call fails, once or from then on, every walk ends, the range is
// added and announced once, and it stays within what the caller gave.
TEST_F(FailureTest, FailedStepsEndEveryWalk) {
    for (Fn fn : {Fn::CHGetItem, Fn::CHNextItemId, Fn::DAGetAnno}) {
        uint64_t count = 0;
        {
            Doc doc(NewDoc(kExample));
            antk::resetCalls();
            ADD_OK(AddRange(doc, Pos(1), Pos(8)));
            count = antk::calls(fn);
        }
        for (bool sticky : {false, true}) {
            for (uint64_t n = 1; n <= count; ++n) {
                Doc doc(NewDoc(kExample));
                notes.calls.clear();
                antk::failCall(fn, n, kCode, sticky);
                const uint32_t rc = AddRange(doc, Pos(1), Pos(8));
                antk::clearFailures();
                EXPECT_TRUE(rc == AN_OK || rc == kCode) << antk::fnName(fn) << " " << n;
                EXPECT_TRUE(annotest::TableInvariantsHold(doc)) << antk::fnName(fn) << " " << n;
                EXPECT_EQ(notes.calls.size(), rc == AN_OK ? 1u : 0u) << antk::fnName(fn) << n;
                const ANPos first = Pos(1), end = Pos(8);
                for (const Stored &s : StoredEntries(doc)) {
                    EXPECT_GE(ANCompPos(&s.start, &first), 0) << antk::fnName(fn) << " " << n;
                    EXPECT_LE(ANCompPos(&s.end, &end), 0) << antk::fnName(fn) << " " << n;
                }
            }
        }
    }
}

TEST_F(FailureTest, ChunkerThatCannotStepLeavesTheStartAsOneStep) {
    for (Fn fn : {Fn::CHGetItem, Fn::CHNextItemId}) {
        Doc doc(NewDoc(kExample));
        antk::failCall(fn, 1, kCode, true);
        ADD_OK(AddRange(doc, Pos(1), Pos(8)));
        antk::clearFailures();
        EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(Pos(1), Pos(1, 0))}))
            << antk::fnName(fn);
    }
}

TEST_F(FailureTest, ItemTheChunkerCannotGiveIsNotSkipped) {
    Doc doc(NewDoc("..S......."));
    antk::failCall(Fn::CHGetItem, 1, kCode);  // the first look at item 2
    ADD_OK(AddRange(doc, Pos(2), Pos(2)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(2, 3)}));
}

// After the last cut only skipped items are left up to the document's end: settling
// the last piece's start stops there.
TEST_F(FailureTest, LastPieceOverSkippedItemsToTheDocumentsEnd) {
    Doc doc(NewDoc("....cSS"));
    ADD_OK(AddRange(doc, Pos(1), Pos(6)));
    EXPECT_EQ(StoredEntries(doc), (std::vector<Stored>{Range(1, 4), Mark(4)}));
}

}  // namespace
