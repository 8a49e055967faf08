// Copying every annotation and per-document style of one document into another.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "copybuild/entries.h"
#include "hosts/heap.h"
#include "styles/styles.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::Doc;
using annotest::PlainDocument;
using annotest::Pos;
using annotest::TableInvariantsHold;
using antk::Fn;
using copybuild::Entries;
using copybuild::EntryView;
using copybuild::StateOf;
using copybuild::TableBytes;
using copybuild::TextBuffers;

class CopyAnnosTest : public annotest::LeakCheckedTest {};

uint32_t CountCalls(uint16_t, uint16_t, void *, void *data) {
    ++*static_cast<int *>(data);
    return 0;
}

ANAnnoRecord Hilite(uint32_t tag, ANPos start, ANPos end, uint32_t style, uint64_t userData = 0) {
    ANAnnoRecord r{};
    r.size = AN_RECORD_SIZE_POINT;
    r.tag = tag;
    r.start = start;
    r.end = end;
    r.eventMask = 3;
    r.userData = userData;
    r.value = 42;
    r.style = style;
    return r;
}

ANAnnoRecord Point(uint32_t tag, ANPos at, uint64_t carried) {
    ANAnnoRecord r{};
    r.size = AN_RECORD_SIZE_POINT;
    r.tag = tag;
    r.start = at;
    r.end = at;
    r.eventMask = 1;
    r.value = 7;
    r.value64 = carried;
    return r;
}

void AddText(DAHandle doc, uint32_t tag, ANPos at, const std::u16string &text) {
    ANTextDesc d{};
    d.size = sizeof d;
    d.tag = tag;
    d.pos = at;
    d.text = reinterpret_cast<const uint16_t *>(text.data());
    d.textLength = static_cast<uint32_t>(text.size());
    ASSERT_EQ(ANAddAnno(doc, AN_TYPE_TEXT, &d), AN_OK);
}

void Add(DAHandle doc, uint16_t type, const ANAnnoRecord &r) {
    ASSERT_EQ(ANAddAnno(doc, type, &r), AN_OK);
}

ANHiliteStyle Style(uint32_t id, uint32_t color1) {
    ANHiliteStyle s{};
    s.size = ANHILITESTYLE_SIZE;
    s.styleId = id;
    s.flags = ANSTYLE_COLOR1;
    s.color1 = color1;
    s.attr2 = 0xFFFF;
    return s;
}

// A source with a highlight, two points, a text and a style.
void FillSource(DAHandle doc) {
    Add(doc, AN_TYPE_HILITE, Hilite(0x11, Pos(2), Pos(5), 0x40000007));
    Add(doc, AN_TYPE_POINT, Point(0x22, Pos(4), 999));
    Add(doc, AN_TYPE_VALUE, Point(0x44, Pos(1), 0));
    AddText(doc, 0x55, Pos(6), u"abc");
    const ANHiliteStyle s = Style(7, 0x0000FF);
    ASSERT_EQ(ANAddHiliteStyle(doc, &s), AN_OK);
}

std::vector<uint32_t> Tags(const std::vector<EntryView> &entries) {
    std::vector<uint32_t> tags;
    for (const EntryView &e : entries) tags.push_back(e.tag);
    return tags;
}

std::string StyleBytes(DAHandle doc) {
    const ANStyleTable *t = StateOf(doc)->styles;
    if (t == nullptr || t->styles == nullptr) return {};
    return std::string(reinterpret_cast<const char *>(t->styles), sizeof(ANHiliteStyle) * t->count);
}

TEST_F(CopyAnnosTest, EmptyDestinationReceivesEveryEntryInSourceOrderWithoutNotification) {
    Doc src(PlainDocument(10));
    Doc dest(PlainDocument(10));
    int srcCalls = 0;
    int destCalls = 0;
    ASSERT_EQ(ANInit(src, nullptr, CountCalls, &srcCalls), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, CountCalls, &destCalls), AN_OK);
    FillSource(src);
    const std::vector<EntryView> before = Entries(src);
    const std::string srcBytes = TableBytes(src);
    srcCalls = 0;

    ASSERT_EQ(ANCopyAnnos(dest, src), AN_OK);

    const std::vector<EntryView> copied = Entries(dest);
    ASSERT_EQ(copied.size(), before.size());
    for (size_t i = 0; i < copied.size(); ++i) {
        EXPECT_TRUE(copied[i].sameAnnotation(before[i]))
            << ::testing::PrintToString(copied[i]) << " vs " << ::testing::PrintToString(before[i]);
        EXPECT_EQ(copied[i].flags, 0) << "a copy never owns the source caller's userData";
    }
    EXPECT_EQ(destCalls, 0);
    EXPECT_EQ(srcCalls, 0);
    EXPECT_EQ(TableBytes(src), srcBytes) << "the source stays byte for byte";
    EXPECT_TRUE(TableInvariantsHold(dest));

    // The text lives in a buffer of the destination's own.
    const std::vector<const uint16_t *> srcTexts = TextBuffers(src);
    const std::vector<const uint16_t *> destTexts = TextBuffers(dest);
    ASSERT_EQ(destTexts.size(), 1u);
    ASSERT_EQ(srcTexts.size(), 1u);
    EXPECT_NE(destTexts[0], srcTexts[0]);
    EXPECT_EQ(StateOf(dest)->entries->hasText, 1u);

    // Releasing the source leaves the copies intact.
    ASSERT_EQ(ANDeInit(src), AN_OK);
    const std::vector<EntryView> after = Entries(dest);
    ASSERT_EQ(after.size(), before.size());
    for (size_t i = 0; i < after.size(); ++i) EXPECT_TRUE(after[i].sameAnnotation(before[i]));
}

TEST_F(CopyAnnosTest, CopiesMergeWithTheDestinationsOwnEntriesByPosition) {
    Doc src(PlainDocument(10));
    Doc dest(PlainDocument(10));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
    Add(dest, AN_TYPE_HILITE, Hilite(0xD0, Pos(0), Pos(3), 1));
    Add(dest, AN_TYPE_POINT, Point(0xD1, Pos(5), 0));
    Add(src, AN_TYPE_HILITE, Hilite(0x52, Pos(7), Pos(9), 2));
    Add(src, AN_TYPE_POINT, Point(0x51, Pos(4), 0));
    Add(src, AN_TYPE_VALUE, Point(0x53, Pos(5), 0));
    Add(src, AN_TYPE_HILITE, Hilite(0x50, Pos(0), Pos(1), 3));

    ASSERT_EQ(ANCopyAnnos(dest, src), AN_OK);

    // Equal starts keep the destination's entry first: the copy came later.
    EXPECT_EQ(Tags(Entries(dest)), (std::vector<uint32_t>{0xD0, 0x50, 0x51, 0xD1, 0x53, 0x52}));
    EXPECT_TRUE(TableInvariantsHold(dest));
    EXPECT_EQ(Tags(Entries(src)), (std::vector<uint32_t>{0x50, 0x51, 0x53, 0x52}));
}

TEST_F(CopyAnnosTest, SourceStylesJoinTheDestinationsAndReplaceThoseWithTheSameId) {
    Doc src(PlainDocument(10));
    Doc dest(PlainDocument(10));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
    Add(src, AN_TYPE_HILITE, Hilite(1, Pos(1), Pos(2), 0x40000007));
    const ANHiliteStyle srcStyles[] = {Style(7, 0x0000FF), Style(8, 0x00FF00)};
    const ANHiliteStyle destStyles[] = {Style(7, 0xFF0000), Style(9, 0x123456)};
    for (const ANHiliteStyle &s : srcStyles) ASSERT_EQ(ANAddHiliteStyle(src, &s), AN_OK);
    for (const ANHiliteStyle &s : destStyles) ASSERT_EQ(ANAddHiliteStyle(dest, &s), AN_OK);
    const std::string srcStyleBytes = StyleBytes(src);

    ASSERT_EQ(ANCopyAnnos(dest, src), AN_OK);

    ANHiliteStyle got{};
    ASSERT_EQ(ANGetHiliteStyle(dest, 7, &got), 1u);
    EXPECT_EQ(got.color1, 0x0000FFu) << "the source's style 7 replaced the destination's";
    ASSERT_EQ(ANGetHiliteStyle(dest, 8, &got), 1u);
    EXPECT_EQ(got.color1, 0x00FF00u);
    ASSERT_EQ(ANGetHiliteStyle(dest, 9, &got), 1u);
    EXPECT_EQ(got.color1, 0x123456u) << "the destination's other styles stay";
    EXPECT_EQ(StateOf(dest)->styles->count, 3);
    EXPECT_EQ(StyleBytes(src), srcStyleBytes);
}

TEST_F(CopyAnnosTest, SourceWithoutEntriesCopiesNothingAndNeverLooksAtTheDestination) {
    Doc src(PlainDocument(4));
    Doc dest(PlainDocument(4));
    Doc bare(PlainDocument(4));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
    const ANHiliteStyle s = Style(7, 1);
    ASSERT_EQ(ANAddHiliteStyle(src, &s), AN_OK);

    EXPECT_EQ(ANCopyAnnos(nullptr, src), AN_OK);
    EXPECT_EQ(ANCopyAnnos(bare, src), AN_OK) << "a destination without state is not examined";
    antk::resetCalls();
    EXPECT_EQ(ANCopyAnnos(dest, src), AN_OK);
    EXPECT_EQ(antk::calls(Fn::DAGetAnno), 1u);
    EXPECT_EQ(StateOf(dest)->entries, nullptr);
    EXPECT_EQ(ANGetHiliteStyle(dest, 7, nullptr), 0u) << "without entries not even styles";
}

TEST_F(CopyAnnosTest, BadHandlesAndMissingStatesAreReportedSourceFirst) {
    Doc src(PlainDocument(4));
    Doc dest(PlainDocument(4));
    Doc bare(PlainDocument(4));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
    Add(src, AN_TYPE_POINT, Point(1, Pos(1), 0));

    EXPECT_EQ(ANCopyAnnos(dest, nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANCopyAnnos(nullptr, nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANCopyAnnos(dest, bare), AN_ERR_NOSTATE);
    EXPECT_EQ(ANCopyAnnos(nullptr, bare), AN_ERR_NOSTATE) << "the source is examined first";
    EXPECT_EQ(ANCopyAnnos(nullptr, src), AN_ERR_BADARG);
    EXPECT_EQ(ANCopyAnnos(bare, src), AN_ERR_NOSTATE);
    EXPECT_EQ(StateOf(dest)->entries, nullptr);
    EXPECT_EQ(Entries(src).size(), 1u);
}

TEST_F(CopyAnnosTest, DataAccessFailuresArePassedOnAtEachLookup) {
    const ANHiliteStyle s = Style(7, 1);
    struct Case {
        uint64_t failingLookup;
        size_t entriesCopied;
        bool styleCopied;
    };
    // Lookups: the source, the destination, the destination again before the styles.
    for (const Case c : {Case{1, 0, false}, Case{2, 0, false}, Case{3, 2, false}}) {
        Doc src(PlainDocument(4));
        Doc dest(PlainDocument(4));
        ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
        ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
        Add(src, AN_TYPE_POINT, Point(1, Pos(1), 0));
        Add(src, AN_TYPE_POINT, Point(2, Pos(2), 0));
        ASSERT_EQ(ANAddHiliteStyle(src, &s), AN_OK);

        antk::failCall(Fn::DAGetAnno, c.failingLookup, 77);
        EXPECT_EQ(ANCopyAnnos(dest, src), 77u) << c.failingLookup;
        antk::clearFailures();
        EXPECT_EQ(Entries(dest).size(), c.entriesCopied) << c.failingLookup;
        EXPECT_EQ(ANGetHiliteStyle(dest, 7, nullptr), c.styleCopied ? 1u : 0u);
    }
}

TEST_F(CopyAnnosTest, CopyingADocumentOntoItselfLeavesItAsItWas) {
    Doc doc(PlainDocument(10));
    int calls = 0;
    ASSERT_EQ(ANInit(doc, nullptr, CountCalls, &calls), AN_OK);
    FillSource(doc);
    ANRangeDesc range{sizeof(ANRangeDesc), 0x33, Pos(7), Pos(8), 0};
    ASSERT_EQ(ANAddAnno(doc, AN_TYPE_RANGE, &range), AN_OK);
    calls = 0;
    const std::string tableBefore = TableBytes(doc);
    const std::string stylesBefore = StyleBytes(doc);
    const uint16_t stylesCount = StateOf(doc)->styles->count;

    EXPECT_EQ(ANCopyAnnos(doc, doc), AN_OK);

    EXPECT_EQ(TableBytes(doc), tableBefore);
    EXPECT_EQ(StyleBytes(doc), stylesBefore);
    EXPECT_EQ(StateOf(doc)->styles->count, stylesCount);
    EXPECT_EQ(calls, 0);
}

#if ANNO_HAVE_PLATFORM_CONTROLS
// ANInit's second allocation is the per-document style table; failing it leaves the
// document without one.
void InitWithoutStyleTable(DAHandle doc) {
    anwin::failAllocation(2);
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    anwin::clearFailures();
    ASSERT_EQ(StateOf(doc)->styles, nullptr);
}
#endif

TEST_F(CopyAnnosTest, MissingStyleTablesOnEitherSideLeaveTheEntriesCopied) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    {
        Doc src(PlainDocument(4));
        Doc dest(PlainDocument(4));
        InitWithoutStyleTable(src);
        ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
        Add(src, AN_TYPE_POINT, Point(1, Pos(1), 0));
        antk::resetCalls();
        EXPECT_EQ(ANCopyAnnos(dest, src), AN_OK);
        EXPECT_EQ(antk::calls(Fn::DAGetAnno), 2u) << "no styles: no second destination lookup";
        EXPECT_EQ(Entries(dest).size(), 1u);
    }
    {
        Doc src(PlainDocument(4));
        Doc dest(PlainDocument(4));
        ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
        InitWithoutStyleTable(dest);
        Add(src, AN_TYPE_POINT, Point(1, Pos(1), 0));
        const ANHiliteStyle s = Style(7, 1);
        ASSERT_EQ(ANAddHiliteStyle(src, &s), AN_OK);
        EXPECT_EQ(ANCopyAnnos(dest, src), AN_OK);
        EXPECT_EQ(Entries(dest).size(), 1u);
        EXPECT_EQ(StateOf(dest)->styles, nullptr);
    }
#endif
}

TEST_F(CopyAnnosTest, OutOfMemoryAnywhereLosesOnlyCopiesAndLeaksNothing) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    Doc src(PlainDocument(12));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    FillSource(src);
    // Enough entries that the destination's table grows while copying.
    for (uint32_t i = 0; i < 10; ++i) Add(src, AN_TYPE_VALUE, Point(0x100 + i, Pos(i + 1), 0));
    AddText(src, 0x56, Pos(9), u"defg");
    const std::vector<EntryView> source = Entries(src);
    const std::string srcBytes = TableBytes(src);

    uint64_t needed = 0;
    {
        Doc dest(PlainDocument(12));
        ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
        anwin::resetCounters();
        ASSERT_EQ(ANCopyAnnos(dest, src), AN_OK);
        needed = anwin::allocations();
        ASSERT_EQ(Entries(dest).size(), source.size());
    }
    ASSERT_GE(needed, 5u) << "table, growth, two texts and the style array";

    for (uint64_t n = 1; n <= needed; ++n) {
        Doc dest(PlainDocument(12));
        ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
        anwin::resetCounters();
        anwin::failAllocation(n);
        EXPECT_EQ(ANCopyAnnos(dest, src), AN_OK) << "allocation " << n;
        anwin::clearFailures();
        EXPECT_EQ(TableBytes(src), srcBytes) << "allocation " << n;
        EXPECT_TRUE(TableInvariantsHold(dest)) << "allocation " << n;
        const std::vector<EntryView> copied = Entries(dest);
        EXPECT_LE(copied.size(), source.size());
        size_t from = 0;  // copies appear in source order
        for (const EntryView &e : copied) {
            while (from < source.size() && !e.sameAnnotation(source[from])) ++from;
            EXPECT_LT(from, source.size()) << ::testing::PrintToString(e) << " at " << n;
            ++from;
        }
    }
#endif
}

}  // namespace
