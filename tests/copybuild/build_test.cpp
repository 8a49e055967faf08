// Building styled highlights from the document's own ranges.
#include <gtest/gtest.h>

#include <vector>

#include "copybuild/entries.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TableInvariantsHold;
using antk::Fn;
using copybuild::Entries;
using copybuild::EntryView;
using copybuild::StateOf;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;
constexpr uint32_t kLink = 0x8003000C;
constexpr uint32_t kMarkedEnd = 0x80020008;
constexpr uint32_t kField = 0x84000010;
constexpr uint32_t kPlain = 0x81000000;
constexpr uint32_t kUncolored = 0x82000000;
constexpr uint32_t kUnknown = 0x80000001;

class BuildAnnosTest : public annotest::LeakCheckedTest {};

struct Notice {
    uint16_t code;
    uint16_t detail;
    ANAnnoRecord record;
};

uint32_t Record(uint16_t code, uint16_t detail, void *record, void *data) {
    static_cast<std::vector<Notice> *>(data)->push_back(
        Notice{code, detail, *static_cast<ANAnnoRecord *>(record)});
    return 0;
}

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

EntryView Built(uint32_t tag, Span s, uint32_t eventMask, uint32_t style) {
    EntryView e;
    e.type = AN_TYPE_HILITE;
    e.size = 72;
    e.tag = tag;
    e.start = Pos(s.first);
    e.end = Pos(s.after);
    e.eventMask = eventMask;
    e.userData = s.first;
    e.word64 = style;
    return e;
}

void ExpectEntries(DAHandle doc, const std::vector<EntryView> &expected) {
    const std::vector<EntryView> got = Entries(doc);
    ASSERT_EQ(got.size(), expected.size());
    for (size_t i = 0; i < got.size(); ++i) {
        EXPECT_TRUE(got[i].sameAnnotation(expected[i]))
            << "entry " << i << ": " << ::testing::PrintToString(got[i]) << " expected "
            << ::testing::PrintToString(expected[i]);
        EXPECT_EQ(got[i].flags, 0) << "a built entry does not own its userData";
    }
    EXPECT_TRUE(TableInvariantsHold(doc));
}

TEST_F(BuildAnnosTest, EachBuiltRangeCodeGivesItsTagEventsAndStyleAndIsAnnounced) {
    antk::DocumentBuilder b;
    b.item(antk::kItemParagraph);
    const Span link = AddSpan(b, kLink);
    const Span marked = AddSpan(b, kMarkedEnd);
    const Span field = AddSpan(b, kField);
    AddSpan(b, kUnknown);
    const Span plain = AddSpan(b, kPlain);
    const Span uncolored = AddSpan(b, kUncolored);
    Doc doc(b.build());
    std::vector<Notice> notices;
    ASSERT_EQ(ANInit(doc, nullptr, Record, &notices), AN_OK);

    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);

    EntryView markedEntry = Built(0x80100001, marked, 15, 0x40001004);
    markedEntry.end = Pos(marked.after, kNo, marked.after, 0xFFFFFFFF);
    const std::vector<EntryView> expected = {
        Built(0x80200000, link, 15, 0x40001002),
        markedEntry,
        Built(0x84000002, field, 15, 0x40001001),
        // Range 3 has a code that is not built; the numbers go on counting it.
        Built(0x81000004, plain, 0, 0x40001000),
        Built(0x82000005, uncolored, 12, 0x30000000),
    };
    ExpectEntries(doc, expected);
    EXPECT_EQ(StateOf(doc)->buildCursor, 6u);

    ASSERT_EQ(notices.size(), expected.size());
    for (size_t i = 0; i < notices.size(); ++i) {
        EXPECT_EQ(notices[i].code, ANNOTIFY_ADDED);
        EXPECT_EQ(notices[i].detail, AN_TYPE_HILITE);
        EXPECT_EQ(notices[i].record.tag, expected[i].tag);
        EXPECT_EQ(notices[i].record.start, expected[i].start);
        EXPECT_EQ(notices[i].record.end, expected[i].end);
        EXPECT_EQ(notices[i].record.userData, expected[i].userData);
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

    const std::vector<EntryView> got = Entries(doc);
    ASSERT_EQ(got.size(), 2u);
    EXPECT_EQ(got[0].start, Pos(first));
    EXPECT_EQ(got[0].end, Pos(text, kNo, text, textFirstChar));
    EXPECT_EQ(got[1].start, Pos(last));
    EXPECT_EQ(got[1].end, Pos(antk::kNoNextItem, kNo, antk::kNoNextItem, 0xFFFFFFFF))
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
    std::vector<Notice> notices;
    ASSERT_EQ(ANInit(doc, nullptr, Record, &notices), AN_OK);

    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    ExpectEntries(doc, {Built(0x80200000, link, 15, 0x40001002)});
    EXPECT_EQ(StateOf(doc)->buildCursor, 2u);
    EXPECT_EQ(notices.size(), 1u);

    antk::resetCalls();
    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_EQ(antk::calls(Fn::CHGetItemId), 0u);
    EXPECT_EQ(antk::calls(Fn::CHGetItem), 0u);
    EXPECT_EQ(notices.size(), 1u);
    EXPECT_EQ(Entries(doc).size(), 1u);
}

TEST_F(BuildAnnosTest, ALaterCallExaminesOnlyTheRangesAfterTheCursor) {
    antk::DocumentBuilder b;
    std::vector<Span> spans;
    for (uint32_t code : {kLink, kField, kPlain, kUncolored}) spans.push_back(AddSpan(b, code));
    Doc doc(b.build());
    std::vector<Notice> notices;
    ASSERT_EQ(ANInit(doc, nullptr, Record, &notices), AN_OK);
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
    EXPECT_EQ(Entries(doc).size(), 2u) << "nothing is built twice";
    EXPECT_EQ(notices.size(), 2u);
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
    EXPECT_EQ(StateOf(doc)->entries, nullptr);

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

// A document whose ranges each cost three or four chunker reads.
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

std::vector<uint32_t> Tags(DAHandle doc) {
    std::vector<uint32_t> tags;
    for (const EntryView &e : Entries(doc)) tags.push_back(e.tag);
    return tags;
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
        expected.erase(expected.begin() + static_cast<long>(n - 1));
        EXPECT_EQ(Tags(doc), expected) << "failing lookup " << n;
        EXPECT_EQ(StateOf(doc)->buildCursor, 3u);
    }
}

TEST_F(BuildAnnosTest, AFailedItemReadPassesOverItsRangeOrLeavesTheMarkedEndWithoutText) {
    uint64_t reads = 0;
    {
        std::vector<Span> spans;
        Doc doc(ThreeRanges(&spans));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        antk::resetCalls();
        ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
        reads = antk::calls(Fn::CHGetItem);
        ASSERT_EQ(Entries(doc).size(), 3u);
    }
    // Per range: its record, then its items up to the end item; the marked range
    // reads the item after it once more.
    ASSERT_EQ(reads, 4u + 4u + 4u);
    std::vector<int> missing(3, 0);
    int textLost = 0;
    for (uint64_t n = 1; n <= reads; ++n) {
        std::vector<Span> spans;
        Doc doc(ThreeRanges(&spans));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        antk::failCall(Fn::CHGetItem, n, 91);
        EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
        antk::clearFailures();
        EXPECT_EQ(StateOf(doc)->buildCursor, 3u);
        const std::vector<EntryView> got = Entries(doc);
        EXPECT_GE(got.size(), 2u) << "read " << n;
        std::vector<bool> seen(3, false);
        for (const EntryView &e : got) {
            const uint32_t index = e.tag & 0xFF;
            ASSERT_LT(index, 3u);
            seen[index] = true;
            EXPECT_EQ(e.start, Pos(spans[index].first));
            EXPECT_EQ(e.end.itemId, spans[index].after);
            if (index == 1 && e.end.textIndex == 0xFFFFFFFF) ++textLost;
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
        ASSERT_EQ(Entries(doc).size(), 12u);
    }
    ASSERT_GE(needed, 2u) << "the table and its growth";
    for (uint64_t n = 1; n <= needed; ++n) {
        std::vector<Span> spans;
        Doc doc(make(&spans));
        std::vector<Notice> notices;
        ASSERT_EQ(ANInit(doc, nullptr, Record, &notices), AN_OK);
        anwin::resetCounters();
        anwin::failAllocation(n);
        EXPECT_EQ(ANBuildAnnos(doc), AN_OK) << "allocation " << n;
        anwin::clearFailures();
        EXPECT_EQ(StateOf(doc)->buildCursor, 12u);
        EXPECT_TRUE(TableInvariantsHold(doc)) << "allocation " << n;
        const std::vector<EntryView> got = Entries(doc);
        EXPECT_GE(got.size(), 11u) << "allocation " << n;
        EXPECT_LE(notices.size(), got.size());
        for (const EntryView &e : got) {
            const uint32_t index = e.tag & 0xFF;
            ASSERT_LT(index, 12u);
            EXPECT_EQ(e.start, Pos(spans[index].first));
            EXPECT_EQ(e.end.itemId, spans[index].after);
        }
    }
#endif
}

}  // namespace
