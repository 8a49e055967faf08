// The lookup index of large tables must never change a result: stepping through
// annotation text, reading it, trimming and cutting ranges and shifting text
// positions give on a table with an index exactly what they give by walking the
// list. Each scenario runs on a document whose table stays small (walked) and on the
// same document carrying some hundreds of point annotations elsewhere (indexed),
// which take no part in any of these operations.
#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

#include "binding/instance.h"
#include "store/index.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::AddCutMark;
using annotest::AddHilite;
using annotest::AddPlaceholder;
using annotest::AddPoint;
using annotest::AddRange;
using annotest::AddText;
using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;
constexpr uint32_t kFillerTag = 0x7777;
constexpr uint32_t kFillers = 300;
constexpr uint32_t kLead = 160;   // plain items before the scenario's items
constexpr uint32_t kTrail = 160;  // and after them

// A document: kLead plain items, the scenario's items, kTrail plain items. The
// scenario's text items are the first of their chunk, so character 0 exists and the
// anchors (item, 0xFFFFFFFF) and (item, 0) share their place in the order.
struct Layout {
    uint32_t first = 0;  // id of the scenario's first item
    uint32_t text1 = 0;  // text item "abcdef"
    std::vector<uint32_t> chars1;
    uint32_t text2 = 0;  // text item "ghij"
    std::vector<uint32_t> chars2;
    uint32_t cut = 0;             // a cut item
    uint32_t skip = 0;            // an item ranges pass over
    std::vector<uint32_t> plain;  // plain items of the scenario
};

DAHandle MakeDocument(Layout *layout) {
    antk::DocumentBuilder builder;
    for (uint32_t i = 0; i < kLead; ++i) builder.item(antk::kItemParagraph);
    layout->first = builder.item(antk::kItemParagraph);
    layout->text1 = builder.textItem("abcdef");
    layout->chars1 = builder.charIds(layout->text1);
    for (int i = 0; i < 4; ++i) layout->plain.push_back(builder.item(antk::kItemParagraph));
    layout->cut = builder.cutItem();
    layout->plain.push_back(builder.item(antk::kItemParagraph));
    layout->skip = builder.skippedItem();
    for (int i = 0; i < 3; ++i) layout->plain.push_back(builder.item(antk::kItemParagraph));
    layout->text2 = builder.textItem("ghij");
    layout->chars2 = builder.charIds(layout->text2);
    builder.cutItem();
    for (int i = 0; i < 3; ++i) layout->plain.push_back(builder.item(antk::kItemParagraph));
    for (uint32_t i = 0; i < kTrail; ++i) builder.item(antk::kItemParagraph);
    DAHandle doc = builder.build();
    EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    return doc;
}

// Point annotations on the items before and after the scenario's.
void AddFillers(DAHandle doc, const Layout &layout) {
    for (uint32_t i = 0; i < kFillers / 2; ++i) {
        ASSERT_EQ(AddPoint(doc, Pos(i), kFillerTag), AN_OK);
        ASSERT_EQ(AddPoint(doc, Pos(layout.first + 40 + i), kFillerTag), AN_OK);
    }
}

const ANInstance *InstanceOf(DAHandle doc) {
    return static_cast<const ANInstance *>(antk::annoSlot(doc));
}

// Everything a caller can learn about the scenario: its entries in list order
// (fillers left out), the merged walk from the document's start, the text step and
// the text read at every position of the walk and at a few more.
struct Observed {
    std::vector<std::string> entries;
    std::vector<std::string> walk;
    std::vector<std::string> textSteps;
    std::vector<std::string> reads;
};

std::string Str(const ANPos &p) {
    return std::to_string(p.itemId) + "," + std::to_string(p.subItemId) + "," +
           std::to_string(p.kind) + "," + std::to_string(p.textIndex);
}

Observed Observe(DAHandle doc, const Layout &layout) {
    Observed seen;
    for (const annotest::Listed &e : annotest::ListedEntries(doc)) {
        if (e.record.tag == kFillerTag) continue;
        seen.entries.push_back(std::to_string(e.type) + " tag " + std::to_string(e.record.tag) +
                               " [" + Str(e.record.start) + " - " + Str(e.record.end) + ") " +
                               std::string(e.text.begin(), e.text.end()));
    }
    std::vector<ANPos> probes;
    ANPos pos = Pos(0);
    for (;;) {
        probes.push_back(pos);
        seen.walk.push_back(Str(pos));
        ANPos next{};
        if (ANNextPos(doc, &pos, &next) != AN_OK) break;
        pos = next;
    }
    for (uint32_t anchor : {layout.text1, layout.text2}) {
        for (uint32_t sub : {kNo, 0u, 1u, 3u, 0x10000u}) {
            for (uint32_t index : {0u, 1u, 5u, 40u}) probes.push_back(TextPos(anchor, sub, index));
            probes.push_back(Pos(anchor, sub));
        }
    }
    ANAnnoTextTrack track{};
    EXPECT_EQ(ANStartAnnoTextTrack(doc, &track), AN_OK);
    for (const ANPos &p : probes) {
        ANPos next{};
        const uint32_t rc = ANNextAnnoTextPos(doc, &p, &next);
        seen.textSteps.push_back(Str(p) + " -> " + std::to_string(rc) + " " + Str(next));
        if (p.kind == ANPOS_ANNOTEXT) {
            uint16_t unit = 0;
            const uint32_t read = ANGetAnnoText(doc, &track, &p, &unit);
            seen.reads.push_back(Str(p) + " -> " + std::to_string(read) + " " +
                                 std::to_string(unit));
        }
    }
    ANEndAnnoTextTrack(doc, &track);
    return seen;
}

void ExpectSame(const Observed &walked, const Observed &indexed) {
    EXPECT_EQ(walked.entries, indexed.entries);
    EXPECT_EQ(walked.walk, indexed.walk);
    EXPECT_EQ(walked.textSteps, indexed.textSteps);
    EXPECT_EQ(walked.reads, indexed.reads);
}

// Text at both anchors that share a place in the order, text inside text, a
// placeholder splitting a text, empty text, points and ranges that text moves.
std::vector<uint32_t> AddTexts(DAHandle doc, const Layout &l) {
    std::vector<uint32_t> rc;
    const uint32_t c0 = l.chars1[0];
    rc.push_back(AddHilite(doc, Pos(l.first), Pos(l.text1, c0), 10));
    rc.push_back(AddHilite(doc, Pos(l.first), Pos(l.plain.back()), 11));
    rc.push_back(AddPoint(doc, Pos(l.text1, l.chars1[4]), 12, 5, AN_TYPE_VALUE));
    rc.push_back(AddText(doc, Pos(l.text1, kNo), u"xy", 13));
    rc.push_back(AddText(doc, Pos(l.text1, c0), u"pqrs", 14));
    rc.push_back(AddText(doc, Pos(l.text1, kNo), u"w", 15));
    rc.push_back(AddPlaceholder(doc, Pos(l.text1, l.chars1[2]), 16));
    rc.push_back(AddText(doc, Pos(l.text1, l.chars1[3]), u"", 17));
    rc.push_back(AddText(doc, Pos(l.text1, l.chars1[4]), u"mn", 18));
    const uint32_t t1 = l.chars2[1];
    rc.push_back(AddText(doc, Pos(l.text2, t1), u"tuvw", 25));
    rc.push_back(AddText(doc, TextPos(l.text2, t1, 1), u"zz", 19));
    rc.push_back(AddPlaceholder(doc, TextPos(l.text2, t1, 3), 20));
    rc.push_back(AddText(doc, TextPos(l.text1, kNo, 2), u"k", 21));
    rc.push_back(AddPoint(doc, TextPos(l.text2, t1, 2), 22));
    rc.push_back(AddHilite(doc, TextPos(l.text2, t1, 1), TextPos(l.text2, t1, 4), 23));
    rc.push_back(AddHilite(doc, Pos(l.text1, l.chars1[5]), TextPos(l.text2, t1, 5), 26));
    rc.push_back(AddText(doc, TextPos(l.text2, t1, 2), u"ab", 24));
    rc.push_back(AddText(doc, TextPos(l.text2, t1, 0), u"c", 27));
    rc.push_back(AddText(doc, Pos(l.text2, t1), u"end", 28));
    return rc;
}

// Ranges over cut and skipped items, over existing ranges, markers and text.
std::vector<uint32_t> AddRanges(DAHandle doc, const Layout &l) {
    std::vector<uint32_t> rc;
    rc.push_back(AddRange(doc, Pos(l.plain[1]), Pos(l.plain[2]), 30));
    rc.push_back(AddCutMark(doc, Pos(l.plain[5]), 31));
    rc.push_back(AddRange(doc, Pos(l.first), Pos(l.plain.back()), 32));
    rc.push_back(AddRange(doc, Pos(l.text1, l.chars1[1]), Pos(l.text2, l.chars2[3]), 33));
    rc.push_back(AddRange(doc, Pos(l.skip), Pos(l.plain[6]), 34));
    rc.push_back(AddRange(doc, Pos(l.plain[0]), Pos(l.plain[0]), 35));
    return rc;
}

// Runs a scenario on both documents: the same results, nearly all of them 0.
template <typename Scenario>
void RunOnBoth(DAHandle small, DAHandle large, const Layout &layout, Scenario scenario) {
    const std::vector<uint32_t> walked = scenario(small, layout);
    const std::vector<uint32_t> indexed = scenario(large, layout);
    EXPECT_EQ(walked, indexed);
    size_t added = 0;
    for (uint32_t rc : walked) added += rc == AN_OK ? 1 : 0;
    std::string codes;
    for (uint32_t rc : walked) {
        codes += ' ';
        codes += std::to_string(rc);
    }
    EXPECT_GE(added + 2, walked.size()) << "the scenario adds what it means to:" << codes;
}

class IndexTest : public annotest::LeakCheckedTest {};

TEST_F(IndexTest, TextStepsReadsAndShiftsAreThoseOfTheWalkedList) {
    Layout layout;
    Doc small(MakeDocument(&layout));
    Doc large(MakeDocument(&layout));
    AddFillers(large, layout);
    RunOnBoth(small, large, layout, AddTexts);
    ASSERT_NE(InstanceOf(large)->index, nullptr) << "the scenario ran with an index";
    EXPECT_EQ(InstanceOf(small)->index, nullptr);
    EXPECT_TRUE(annotest::TableInvariantsHold(large));
    ExpectSame(Observe(small, layout), Observe(large, layout));
}

TEST_F(IndexTest, RangeTrimmingAndCuttingAreThoseOfTheWalkedList) {
    Layout layout;
    Doc small(MakeDocument(&layout));
    Doc large(MakeDocument(&layout));
    AddFillers(large, layout);
    RunOnBoth(small, large, layout, AddTexts);
    RunOnBoth(small, large, layout, AddRanges);
    ASSERT_NE(InstanceOf(large)->index, nullptr);
    EXPECT_TRUE(annotest::TableInvariantsHold(large));
    ExpectSame(Observe(small, layout), Observe(large, layout));
}

TEST_F(IndexTest, ClearingKeepsTheIndexTrue) {
    Layout layout;
    Doc small(MakeDocument(&layout));
    Doc large(MakeDocument(&layout));
    AddFillers(large, layout);
    RunOnBoth(small, large, layout, AddTexts);
    RunOnBoth(small, large, layout, AddRanges);
    RunOnBoth(small, large, layout, [](DAHandle doc, const Layout &l) {
        std::vector<uint32_t> rc;
        rc.push_back(ANClearAnnos(doc, ANCLEAR_EQUAL, 16));  // a placeholder: texts join
        rc.push_back(ANClearAnnos(doc, ANCLEAR_EQUAL, 14));  // text under moved entries
        rc.push_back(ANClearAnnos(doc, ANCLEAR_EQUAL, 33));
        rc.push_back(AddText(doc, Pos(l.text1, l.chars1[0]), u"again", 40));
        rc.push_back(AddRange(doc, Pos(l.text1, l.chars1[2]), Pos(l.text2), 41));
        return rc;
    });
    ExpectSame(Observe(small, layout), Observe(large, layout));
}

TEST_F(IndexTest, TheIndexGoesWithTheTable) {
    Layout layout;
    Doc doc(MakeDocument(&layout));
    AddFillers(doc, layout);
    AddTexts(doc, layout);
    ASSERT_NE(InstanceOf(doc)->index, nullptr);
    ASSERT_EQ(ANClearAnnos(doc, 0, 0), AN_OK);
    EXPECT_EQ(InstanceOf(doc)->entries, nullptr);
    EXPECT_EQ(InstanceOf(doc)->index, nullptr) << "freed with the table";
    AddFillers(doc, layout);
    AddTexts(doc, layout);
    EXPECT_NE(InstanceOf(doc)->index, nullptr);
    // ANDeInit frees it with the state: the fixture counts the blocks.
}

TEST_F(IndexTest, IndexStaysBelowSixteenBytesPerAnnotation) {
    Doc doc(annotest::PlainDocument(5000));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    uint32_t checked = 0;
    for (uint32_t i = 0; i < 4000; ++i) {
        ASSERT_EQ(AddPoint(doc, Pos(i)), AN_OK);
        if (i % 50 != 49) continue;
        // Text asks for the index while shifting text positions.
        ASSERT_EQ(AddText(doc, Pos(i), u"t"), AN_OK);
        const ANInstance *instance = InstanceOf(doc);
        if (instance->index == nullptr) continue;
        const double perEntry = static_cast<double>(ANIndexBytes(instance)) /
                                static_cast<double>(instance->entries->count);
        EXPECT_LT(perEntry, 16.0) << instance->entries->count << " entries";
        ++checked;
    }
    EXPECT_GT(checked, 50u);
}

#if ANNO_HAVE_PLATFORM_CONTROLS
// With every allocation failing, no index can be made, and the walks answer alone.
TEST_F(IndexTest, StepsWithoutMemoryForTheIndexGiveTheSameAnswers) {
    Layout layout;
    Doc doc(MakeDocument(&layout));
    AddTexts(doc, layout);  // the table is small yet: no index
    AddFillers(doc, layout);
    ASSERT_EQ(InstanceOf(doc)->index, nullptr);
    anwin::failAllAllocations();
    Observed walked;
    {
        // Reading text needs memory of its own; only the steps are compared here.
        ANPos pos = Pos(0);
        for (;;) {
            walked.walk.push_back(Str(pos));
            ANPos next{};
            ANNextAnnoTextPos(doc, &pos, &next);
            walked.textSteps.push_back(Str(next));
            if (ANNextPos(doc, &pos, &next) != AN_OK) break;
            pos = next;
        }
    }
    anwin::clearFailures();
    EXPECT_EQ(InstanceOf(doc)->index, nullptr);
    Observed indexed;
    ANPos pos = Pos(0);
    for (;;) {
        indexed.walk.push_back(Str(pos));
        ANPos next{};
        ANNextAnnoTextPos(doc, &pos, &next);
        indexed.textSteps.push_back(Str(next));
        if (ANNextPos(doc, &pos, &next) != AN_OK) break;
        pos = next;
    }
    EXPECT_NE(InstanceOf(doc)->index, nullptr);
    EXPECT_EQ(walked.walk, indexed.walk);
    EXPECT_EQ(walked.textSteps, indexed.textSteps);
}

// Each allocation of adding text and a range to a large table fails in turn: a failed
// index allocation is no failure of the call, which then ends as it would have.
TEST_F(IndexTest, OutOfMemoryOnTheIndexChangesNoResult) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    Layout layout;
    auto act = [&](DAHandle doc) {
        uint32_t rc = AddText(doc, Pos(layout.text1, layout.chars1[0]), u"pq", 50);
        if (rc == AN_OK) rc = AddRange(doc, Pos(layout.first), Pos(layout.plain.back()), 51);
        return rc;
    };
    Observed expected;
    uint64_t count = 0;
    {
        Doc doc(MakeDocument(&layout));
        AddFillers(doc, layout);
        anwin::resetCounters();
        ASSERT_EQ(act(doc), AN_OK);
        count = anwin::allocations();
        expected = Observe(doc, layout);
    }
    uint32_t unharmed = 0;
    for (uint64_t n = 1; n <= count; ++n) {
        SCOPED_TRACE(n);
        Doc doc(MakeDocument(&layout));
        AddFillers(doc, layout);
        anwin::failAllocation(n);
        const uint32_t rc = act(doc);
        anwin::clearFailures();
        EXPECT_TRUE(rc == AN_OK || rc == AN_ERR_NOMEM) << rc;
        EXPECT_TRUE(annotest::TableInvariantsHold(doc));
        if (rc != AN_OK) continue;
        ++unharmed;
        ExpectSame(expected, Observe(doc, layout));
    }
    EXPECT_GE(unharmed, 1u) << "the index allocation was among those failed";
}
#endif

}  // namespace
