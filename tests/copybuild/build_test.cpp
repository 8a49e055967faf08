// Building styled highlights from the document's own ranges.
#include <gtest/gtest.h>

#include <vector>

#include "copybuild/entries.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::Doc;
using annotest::Listed;
using annotest::ListedEntries;
using annotest::Notifications;
using annotest::Pos;
using annotest::TableInvariantsHold;
using antk::Fn;
using copybuild::StateOf;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;
constexpr uint32_t kLink = 0x8003000C;
constexpr uint32_t kMarkedEnd = 0x80020008;
constexpr uint32_t kField = 0x84000010;
constexpr uint32_t kPlain = 0x81000000;
constexpr uint32_t kUncolored = 0x82000000;

class BuildAnnosTest : public annotest::LeakCheckedTest {};

// A range's items: its first item, one inside, its end item (type 68 with the code),
// and the item that follows it.
struct Span {
    uint32_t first;
    uint32_t after;
};

Span AddSpan(antk::DocumentBuilder &b, uint32_t code) {
    const uint32_t first = b.item(antk::kItemParagraph);
    b.item(antk::kItemParagraph);
    b.item(antk::kItemRangeEnd, code);
    const uint32_t after = b.item(antk::kItemParagraph);
    b.range(first, code);
    return Span{first, after};
}

// The highlight a range is expected to become.
Listed Built(uint32_t tag, Span s, uint32_t eventMask, uint32_t style) {
    Listed e{};
    e.type = AN_TYPE_HILITE;
    e.record.size = 72;
    e.record.tag = tag;
    e.record.start = Pos(s.first);
    e.record.end = Pos(s.after);
    e.record.eventMask = eventMask;
    e.record.userData = s.first;
    e.record.style = style;
    return e;
}

void ExpectEntries(DAHandle doc, const std::vector<Listed> &expected) {
    const std::vector<Listed> got = ListedEntries(doc);
    ASSERT_EQ(got.size(), expected.size());
    for (size_t i = 0; i < got.size(); ++i) {
        EXPECT_TRUE(copybuild::SameAnnotation(got[i], expected[i])) << "entry " << i;
        EXPECT_EQ(got[i].flags, 0) << "a built entry does not own its userData";
    }
    EXPECT_TRUE(TableInvariantsHold(doc));
}

std::vector<uint32_t> Tags(DAHandle doc) {
    std::vector<uint32_t> tags;
    for (const Listed &e : ListedEntries(doc)) tags.push_back(e.record.tag);
    return tags;
}

TEST_F(BuildAnnosTest, EachBuiltRangeCodeGivesItsTagEventsAndStyleAndIsAnnounced) {
    antk::DocumentBuilder b;
    b.item(antk::kItemParagraph);
    const Span link = AddSpan(b, kLink);
    const Span marked = AddSpan(b, kMarkedEnd);
    const Span field = AddSpan(b, kField);
    AddSpan(b, 0x80000001);  // not a code that is built
    const Span plain = AddSpan(b, kPlain);
    const Span uncolored = AddSpan(b, kUncolored);
    Doc doc(b.build());
    Notifications notices;
    ASSERT_EQ(ANInit(doc, nullptr, Notifications::Callback, &notices), AN_OK);

    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);

    Listed markedEntry = Built(0x80100001, marked, 15, 0x40001004);
    markedEntry.record.end = Pos(marked.after, kNo, marked.after, 0xFFFFFFFF);
    const std::vector<Listed> expected = {
        Built(0x80200000, link, 15, 0x40001002),
        markedEntry,
        Built(0x84000002, field, 15, 0x40001001),
        // Range 3 is passed over; the numbers go on counting it.
        Built(0x81000004, plain, 0, 0x40001000),
        Built(0x82000005, uncolored, 12, 0x30000000),
    };
    ExpectEntries(doc, expected);
    EXPECT_EQ(StateOf(doc)->buildCursor, 6u);

    ASSERT_EQ(notices.calls.size(), expected.size());
    for (size_t i = 0; i < expected.size(); ++i) {
        EXPECT_EQ(notices.calls[i].code, ANNOTIFY_ADDED);
        EXPECT_EQ(notices.calls[i].detail, AN_TYPE_HILITE);
        EXPECT_TRUE(copybuild::SameAnnotation(
            Listed{0, AN_TYPE_HILITE, 0, notices.calls[i].record, {}}, expected[i]));
    }
}

TEST_F(BuildAnnosTest, MarkedEndNamesTheFollowingItemAndItsFirstCharacter) {
    antk::DocumentBuilder b;
    b.textItem("xyz");  // the characters of the chunk's next text item do not start at 0
    const uint32_t first = b.item(antk::kItemParagraph);
    b.item(antk::kItemRangeEnd, kMarkedEnd);
    const uint32_t text = b.textItem("hello");
    b.range(first, kMarkedEnd);
    // A range of the same code whose end item is the document's last item.
    const uint32_t last = b.item(antk::kItemParagraph);
    b.item(antk::kItemRangeEnd, kMarkedEnd);
    b.range(last, kMarkedEnd);
    const uint32_t textFirstChar = b.charIds(text).at(0);
    ASSERT_NE(textFirstChar, 0u);
    Doc doc(b.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);

    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);

    const std::vector<Listed> got = ListedEntries(doc);
    ASSERT_EQ(got.size(), 2u);
    EXPECT_EQ(got[0].record.start, Pos(first));
    EXPECT_EQ(got[0].record.end, Pos(text, kNo, text, textFirstChar));
    EXPECT_EQ(got[1].record.start, Pos(last));
    EXPECT_EQ(got[1].record.end, Pos(antk::kNoNextItem, kNo, antk::kNoNextItem, 0xFFFFFFFF))
        << "after the last item comes no item, and no text";
    EXPECT_TRUE(TableInvariantsHold(doc));
}

TEST_F(BuildAnnosTest, RangeEndsAtTheFirstEndItemOfItsOwnCodeAcrossChunks) {
    antk::DocumentBuilder b;
    const uint32_t first = b.item(antk::kItemParagraph);
    b.item(antk::kItemRangeEnd, kLink);  // another range's end item
    b.newChunk();
    b.item(antk::kItemParagraph, kPlain);  // the code, but not an end item
    b.item(antk::kItemRangeEnd, kPlain);
    const uint32_t after = b.item(antk::kItemParagraph);
    b.item(antk::kItemRangeEnd, kPlain);
    b.range(first, kPlain);
    Doc doc(b.build());
    ASSERT_GT(after, 0xFFFFu) << "the end lies in the second chunk";
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);

    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);

    ExpectEntries(doc, {Built(0x81000000, Span{first, after}, 0, 0x40001000)});
}

TEST_F(BuildAnnosTest, RangesWithoutAnEndItemArePassedOverAndNeverRetried) {
    antk::DocumentBuilder b;
    const Span link = AddSpan(b, kLink);
    const uint32_t open = b.item(antk::kItemParagraph);
    b.range(open, kField);  // no item of type 68 with this code follows
    b.item(antk::kItemRangeEnd, kPlain);
    b.item(antk::kItemParagraph);
    Doc doc(b.build());
    Notifications notices;
    ASSERT_EQ(ANInit(doc, nullptr, Notifications::Callback, &notices), AN_OK);

    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    ExpectEntries(doc, {Built(0x80200000, link, 15, 0x40001002)});
    EXPECT_EQ(StateOf(doc)->buildCursor, 2u);

    antk::resetCalls();
    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_EQ(antk::calls(Fn::CHGetItemId), 0u);
    EXPECT_EQ(antk::calls(Fn::CHGetItem), 0u);
    EXPECT_EQ(notices.calls.size(), 1u);
    EXPECT_EQ(ListedEntries(doc).size(), 1u);
}

TEST_F(BuildAnnosTest, ALaterCallExaminesOnlyTheRangesAfterTheCursor) {
    antk::DocumentBuilder b;
    std::vector<Span> spans;
    for (uint32_t code : {kLink, kField, kPlain, kUncolored}) spans.push_back(AddSpan(b, code));
    Doc doc(b.build());
    Notifications notices;
    ASSERT_EQ(ANInit(doc, nullptr, Notifications::Callback, &notices), AN_OK);
    EXPECT_EQ(StateOf(doc)->buildCursor, 0u);
    // As if an earlier call had examined the first two ranges.
    StateOf(doc)->buildCursor = 2;

    antk::resetCalls();
    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    ExpectEntries(doc, {Built(0x81000002, spans[2], 0, 0x40001000),
                        Built(0x82000003, spans[3], 12, 0x30000000)});
    EXPECT_EQ(antk::calls(Fn::CHGetItemId), 2u);
    EXPECT_EQ(StateOf(doc)->buildCursor, 4u);

    antk::resetCalls();
    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_EQ(antk::calls(Fn::CHGetItemCount), 1u);
    EXPECT_EQ(antk::calls(Fn::CHGetItemId), 0u);
    EXPECT_EQ(ListedEntries(doc).size(), 2u) << "nothing is built twice";
    EXPECT_EQ(notices.calls.size(), 2u);
}

TEST_F(BuildAnnosTest, WithoutARangeCountNothingIsExaminedAndTheNextCallStartsOver) {
    antk::DocumentBuilder b;
    const Span link = AddSpan(b, kLink);
    Doc doc(b.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);

    antk::failCall(Fn::CHGetItemCount, 1, 66);
    antk::resetCalls();
    EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_EQ(antk::calls(Fn::CHGetItemId), 0u);
    EXPECT_EQ(StateOf(doc)->buildCursor, 0u);
    EXPECT_EQ(annotest::TableOf(doc), nullptr);

    EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
    ExpectEntries(doc, {Built(0x80200000, link, 15, 0x40001002)});
}

TEST_F(BuildAnnosTest, BadHandleMissingStateAndLookupFailureExamineNothing) {
    antk::DocumentBuilder b;
    AddSpan(b, kLink);
    Doc doc(b.build());
    EXPECT_EQ(ANBuildAnnos(nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANBuildAnnos(doc), AN_ERR_NOSTATE);
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::DAGetAnno, 1, 71);
    antk::resetCalls();
    EXPECT_EQ(ANBuildAnnos(doc), 71u);
    EXPECT_EQ(antk::calls(Fn::CHGetItemCount), 0u);
    EXPECT_EQ(StateOf(doc)->buildCursor, 0u);
}

// Three ranges of four chunker reads each: the range record and three items for the
// first and last; the record, two items and the item after the end for the marked one.
DAHandle ThreeRanges(std::vector<Span> *spans) {
    antk::DocumentBuilder b;
    spans->push_back(AddSpan(b, kLink));
    const uint32_t first = b.item(antk::kItemParagraph);
    b.item(antk::kItemRangeEnd, kMarkedEnd);
    const uint32_t text = b.textItem("ab");
    b.range(first, kMarkedEnd);
    spans->push_back(Span{first, text});
    spans->push_back(AddSpan(b, kPlain));
    return b.build();
}

TEST_F(BuildAnnosTest, AFailedRangeLookupPassesOverThatRangeOnly) {
    const std::vector<uint32_t> all = {0x80200000, 0x80100001, 0x81000002};
    for (uint64_t n = 1; n <= 3; ++n) {
        std::vector<Span> spans;
        Doc doc(ThreeRanges(&spans));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        antk::failCall(Fn::CHGetItemId, n, 90);
        EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
        std::vector<uint32_t> expected = all;
        expected.erase(expected.begin() + static_cast<std::ptrdiff_t>(n - 1));
        EXPECT_EQ(Tags(doc), expected) << "failing lookup " << n;
        EXPECT_EQ(StateOf(doc)->buildCursor, 3u);
    }
}

TEST_F(BuildAnnosTest, AFailedItemReadPassesOverItsRangeOrLeavesTheMarkedEndWithoutText) {
    constexpr uint64_t kReads = 12;
    std::vector<int> missing(3, 0);
    int textLost = 0;
    {
        std::vector<Span> spans;
        Doc doc(ThreeRanges(&spans));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        antk::resetCalls();
        ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
        ASSERT_EQ(antk::calls(Fn::CHGetItem), kReads);
    }
    for (uint64_t n = 1; n <= kReads; ++n) {
        std::vector<Span> spans;
        Doc doc(ThreeRanges(&spans));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        antk::failCall(Fn::CHGetItem, n, 91);
        EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
        antk::clearFailures();
        EXPECT_EQ(StateOf(doc)->buildCursor, 3u);
        std::vector<bool> seen(3, false);
        for (const Listed &e : ListedEntries(doc)) {
            const uint32_t index = e.record.tag & 0xFF;
            ASSERT_LT(index, 3u);
            seen[index] = true;
            EXPECT_EQ(e.record.start, Pos(spans[index].first));
            EXPECT_EQ(e.record.end.itemId, spans[index].after);
            if (index == 1 && e.record.end.textIndex == 0xFFFFFFFF) ++textLost;
        }
        for (size_t i = 0; i < 3; ++i) missing[i] += seen[i] ? 0 : 1;
    }
    // Every read but the marked range's last one passes its own range over.
    EXPECT_EQ(missing, (std::vector<int>{4, 3, 4}));
    EXPECT_EQ(textLost, 1);
}

TEST_F(BuildAnnosTest, ARangeThatCannotBeAddedIsPassedOverAndTheRestBuilt) {
    std::vector<Span> spans;
    Doc doc(ThreeRanges(&spans));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    // The first lookup is the build's own; the next ones are those of each addition.
    antk::failCall(Fn::DAGetAnno, 3, 92);
    EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_EQ(Tags(doc), (std::vector<uint32_t>{0x80200000, 0x81000002}));
    EXPECT_EQ(StateOf(doc)->buildCursor, 3u);
}

TEST_F(BuildAnnosTest, OutOfMemoryAnywhereLosesOnlyWholeRangesAndLeaksNothing) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    const uint32_t codes[] = {kLink, kMarkedEnd, kField, kPlain, kUncolored};
    auto make = [&codes](std::vector<Span> *spans) {
        antk::DocumentBuilder b;
        // Enough ranges that the table grows while building.
        for (uint32_t i = 0; i < 12; ++i) spans->push_back(AddSpan(b, codes[i % 5]));
        return b.build();
    };
    uint64_t needed = 0;
    {
        std::vector<Span> spans;
        Doc doc(make(&spans));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        anwin::resetCounters();
        ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
        needed = anwin::allocations();
        ASSERT_EQ(ListedEntries(doc).size(), 12u);
    }
    ASSERT_GE(needed, 2u) << "the table and its growth";
    for (uint64_t n = 1; n <= needed; ++n) {
        std::vector<Span> spans;
        Doc doc(make(&spans));
        Notifications notices;
        ASSERT_EQ(ANInit(doc, nullptr, Notifications::Callback, &notices), AN_OK);
        anwin::resetCounters();
        anwin::failAllocation(n);
        EXPECT_EQ(ANBuildAnnos(doc), AN_OK) << "allocation " << n;
        anwin::clearFailures();
        EXPECT_EQ(StateOf(doc)->buildCursor, 12u);
        EXPECT_TRUE(TableInvariantsHold(doc)) << "allocation " << n;
        const std::vector<Listed> got = ListedEntries(doc);
        EXPECT_GE(got.size(), 11u) << "allocation " << n;
        EXPECT_LE(notices.calls.size(), got.size());
        for (const Listed &e : got) {
            const uint32_t index = e.record.tag & 0xFF;
            ASSERT_LT(index, 12u);
            EXPECT_EQ(e.record.start, Pos(spans[index].first));
            EXPECT_EQ(e.record.end.itemId, spans[index].after);
        }
    }
#endif
}

}  // namespace
