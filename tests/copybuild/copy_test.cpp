// Copying every annotation and per-document style of one document into another.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "copybuild/entries.h"
#include "styles/styles.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::AddHilite;
using annotest::AddPoint;
using annotest::AddRange;
using annotest::AddText;
using annotest::Doc;
using annotest::Listed;
using annotest::ListedEntries;
using annotest::Notifications;
using annotest::PlainDocument;
using annotest::Pos;
using annotest::TableInvariantsHold;
using antk::Fn;
using copybuild::SameAnnotation;
using copybuild::StateOf;
using copybuild::TableBytes;

class CopyAnnosTest : public annotest::LeakCheckedTest {};

ANHiliteStyle Style(uint32_t id, uint32_t color1) {
    ANHiliteStyle s{};
    s.size = ANHILITESTYLE_SIZE;
    s.styleId = id;
    s.flags = ANSTYLE_COLOR1;
    s.color1 = color1;
    return s;
}

// A highlight, two points, a text and a style.
void FillSource(DAHandle doc) {
    ASSERT_EQ(AddHilite(doc, Pos(2), Pos(5), 0x11, 0x40000007, 0, 3, 42), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(4), 0x22, 9), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(1), 0x44, 8, AN_TYPE_VALUE), AN_OK);
    ASSERT_EQ(AddText(doc, Pos(6), u"abc", 0x55), AN_OK);
    const ANHiliteStyle s = Style(7, 0x0000FF);
    ASSERT_EQ(ANAddHiliteStyle(doc, &s), AN_OK);
}

std::vector<uint32_t> Tags(DAHandle doc) {
    std::vector<uint32_t> tags;
    for (const Listed &e : ListedEntries(doc)) tags.push_back(e.record.tag);
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
    Notifications srcCalls;
    Notifications destCalls;
    ASSERT_EQ(ANInit(src, nullptr, Notifications::Callback, &srcCalls), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, Notifications::Callback, &destCalls), AN_OK);
    FillSource(src);
    const std::vector<Listed> source = ListedEntries(src);
    const std::string srcBytes = TableBytes(src);
    srcCalls.calls.clear();

    ASSERT_EQ(ANCopyAnnos(dest, src), AN_OK);

    const std::vector<Listed> copied = ListedEntries(dest);
    ASSERT_EQ(copied.size(), source.size());
    for (size_t i = 0; i < copied.size(); ++i) {
        EXPECT_TRUE(SameAnnotation(copied[i], source[i]));
        EXPECT_EQ(copied[i].flags, 0) << "a copy never owns the source caller's userData";
        if (copied[i].type == AN_TYPE_TEXT) {
            EXPECT_EQ(copied[i].text, u"abc");
            EXPECT_NE(copied[i].record.textBuffer, source[i].record.textBuffer);
        }
    }
    EXPECT_TRUE(destCalls.calls.empty());
    EXPECT_TRUE(srcCalls.calls.empty());
    EXPECT_EQ(TableBytes(src), srcBytes) << "the source stays byte for byte";
    EXPECT_TRUE(TableInvariantsHold(dest));

    // The copies hold nothing of the source's.
    ASSERT_EQ(ANDeInit(src), AN_OK);
    const std::vector<Listed> after = ListedEntries(dest);
    ASSERT_EQ(after.size(), source.size());
    for (size_t i = 0; i < after.size(); ++i) EXPECT_TRUE(SameAnnotation(after[i], source[i]));
}

TEST_F(CopyAnnosTest, CopiesMergeWithTheDestinationsOwnEntriesByPosition) {
    Doc src(PlainDocument(10));
    Doc dest(PlainDocument(10));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(AddHilite(dest, Pos(0), Pos(3), 0xD0), AN_OK);
    ASSERT_EQ(AddPoint(dest, Pos(5), 0xD1), AN_OK);
    ASSERT_EQ(AddHilite(src, Pos(7), Pos(9), 0x52), AN_OK);
    ASSERT_EQ(AddPoint(src, Pos(4), 0x51), AN_OK);
    ASSERT_EQ(AddPoint(src, Pos(5), 0x53, 0, AN_TYPE_VALUE), AN_OK);
    ASSERT_EQ(AddHilite(src, Pos(0), Pos(1), 0x50), AN_OK);

    ASSERT_EQ(ANCopyAnnos(dest, src), AN_OK);

    // Equal starts keep the destination's entry first: the copy came later.
    EXPECT_EQ(Tags(dest), (std::vector<uint32_t>{0xD0, 0x50, 0x51, 0xD1, 0x53, 0x52}));
    EXPECT_TRUE(TableInvariantsHold(dest));
    EXPECT_EQ(Tags(src), (std::vector<uint32_t>{0x50, 0x51, 0x53, 0x52}));
}

TEST_F(CopyAnnosTest, SourceStylesJoinTheDestinationsAndReplaceThoseWithTheSameId) {
    Doc src(PlainDocument(10));
    Doc dest(PlainDocument(10));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(AddHilite(src, Pos(1), Pos(2)), AN_OK);
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
    EXPECT_EQ(annotest::TableOf(dest), nullptr);
    EXPECT_EQ(ANGetHiliteStyle(dest, 7, nullptr), 0u) << "without entries not even styles";
}

TEST_F(CopyAnnosTest, BadHandlesAndMissingStatesAreReportedSourceFirst) {
    Doc src(PlainDocument(4));
    Doc dest(PlainDocument(4));
    Doc bare(PlainDocument(4));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(AddPoint(src, Pos(1)), AN_OK);

    EXPECT_EQ(ANCopyAnnos(dest, nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANCopyAnnos(dest, bare), AN_ERR_NOSTATE);
    EXPECT_EQ(ANCopyAnnos(nullptr, bare), AN_ERR_NOSTATE) << "the source is examined first";
    EXPECT_EQ(ANCopyAnnos(nullptr, src), AN_ERR_BADARG);
    EXPECT_EQ(ANCopyAnnos(bare, src), AN_ERR_NOSTATE);
    EXPECT_EQ(annotest::TableOf(dest), nullptr);
    EXPECT_EQ(ListedEntries(src).size(), 1u);
}

TEST_F(CopyAnnosTest, DataAccessFailuresArePassedOnAtEachLookup) {
    const ANHiliteStyle s = Style(7, 1);
    struct Case {
        uint64_t failingLookup;
        size_t entriesCopied;
    };
    // Lookups: the source, the destination, the destination again before the styles.
    for (const Case c : {Case{1, 0}, Case{2, 0}, Case{3, 2}}) {
        Doc src(PlainDocument(4));
        Doc dest(PlainDocument(4));
        ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
        ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
        ASSERT_EQ(AddPoint(src, Pos(1), 1), AN_OK);
        ASSERT_EQ(AddPoint(src, Pos(2), 2), AN_OK);
        ASSERT_EQ(ANAddHiliteStyle(src, &s), AN_OK);

        antk::failCall(Fn::DAGetAnno, c.failingLookup, 77);
        EXPECT_EQ(ANCopyAnnos(dest, src), 77u) << c.failingLookup;
        antk::clearFailures();
        EXPECT_EQ(ListedEntries(dest).size(), c.entriesCopied) << c.failingLookup;
        EXPECT_EQ(ANGetHiliteStyle(dest, 7, nullptr), 0u) << c.failingLookup;
    }
}

TEST_F(CopyAnnosTest, CopyingADocumentOntoItselfLeavesItAsItWas) {
    Doc doc(PlainDocument(10));
    Notifications calls;
    ASSERT_EQ(ANInit(doc, nullptr, Notifications::Callback, &calls), AN_OK);
    FillSource(doc);
    ASSERT_EQ(AddRange(doc, Pos(7), Pos(8), 0x33), AN_OK);
    calls.calls.clear();
    const std::string tableBefore = TableBytes(doc);
    const std::string stylesBefore = StyleBytes(doc);

    EXPECT_EQ(ANCopyAnnos(doc, doc), AN_OK);

    EXPECT_EQ(TableBytes(doc), tableBefore);
    EXPECT_EQ(StyleBytes(doc), stylesBefore);
    EXPECT_TRUE(calls.calls.empty());
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
    const ANHiliteStyle s = Style(7, 1);
    for (const bool srcHasStyles : {false, true}) {
        Doc src(PlainDocument(4));
        Doc dest(PlainDocument(4));
        if (srcHasStyles) {
            ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
            ASSERT_EQ(ANAddHiliteStyle(src, &s), AN_OK);
            InitWithoutStyleTable(dest);
        } else {
            InitWithoutStyleTable(src);
            ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
        }
        ASSERT_EQ(AddPoint(src, Pos(1)), AN_OK);
        antk::resetCalls();
        EXPECT_EQ(ANCopyAnnos(dest, src), AN_OK);
        // Without source styles there is no second lookup of the destination.
        EXPECT_EQ(antk::calls(Fn::DAGetAnno), srcHasStyles ? 3u : 2u);
        EXPECT_EQ(ListedEntries(dest).size(), 1u);
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
    for (uint32_t i = 0; i < 10; ++i) {
        ASSERT_EQ(AddPoint(src, Pos(i + 1), 0x100 + i, 0, AN_TYPE_VALUE), AN_OK);
    }
    ASSERT_EQ(AddText(src, Pos(9), u"defg", 0x56), AN_OK);
    const std::vector<Listed> source = ListedEntries(src);
    const std::string srcBytes = TableBytes(src);

    uint64_t needed = 0;
    {
        Doc dest(PlainDocument(12));
        ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
        anwin::resetCounters();
        ASSERT_EQ(ANCopyAnnos(dest, src), AN_OK);
        needed = anwin::allocations();
        ASSERT_EQ(ListedEntries(dest).size(), source.size());
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
        const std::vector<Listed> copied = ListedEntries(dest);
        EXPECT_LE(copied.size(), source.size());
        EXPECT_GE(copied.size() + 1, source.size()) << "at most one copy lost, at " << n;
        size_t from = 0;  // the copies that made it, in source order
        for (const Listed &e : copied) {
            while (from < source.size() && !SameAnnotation(e, source[from])) ++from;
            EXPECT_LT(from, source.size()) << "allocation " << n;
            ++from;
        }
    }
#endif
}

}  // namespace
