// Removing annotations by tag: selection, the callback's view and result, the table's
// life, and what removing annotation text does to the text and positions around it.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "clear/clear_support.h"

namespace {

using annotest::AddCutMark;
using annotest::AddHilite;
using annotest::AddPlaceholder;
using annotest::AddPoint;
using annotest::AddText;
using annotest::AnchorText;
using annotest::Doc;
using annotest::Listed;
using annotest::ListedEntries;
using annotest::PlainDocument;
using annotest::Pos;
using annotest::TableOf;
using annotest::TextPos;
using cleartest::MutableTable;
using cleartest::Recorder;
using cleartest::StateOf;
using cleartest::StoreHolds;
using cleartest::Tagged;
using cleartest::Tags;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;
const ANPos kAnchor = Pos(1);          // content position carrying annotation text
const ANPos kAfterAnchor = Pos(1, 0);  // one step after it

class ClearAnnosTest : public annotest::LeakCheckedTest {
 protected:
    static DAHandle NewDoc() {
        DAHandle doc = PlainDocument(8);
        EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        return doc;
    }
};

std::vector<uint32_t> Without(std::vector<uint32_t> tags, std::vector<uint32_t> removed) {
    std::vector<uint32_t> kept;
    for (uint32_t tag : tags) {
        bool gone = false;
        for (uint32_t r : removed) gone = gone || r == tag;
        if (!gone) kept.push_back(tag);
    }
    return kept;
}

TEST_F(ClearAnnosTest, RefusesNullDocumentsAndDocumentsWithoutStateAndIgnoresAMissingTable) {
    EXPECT_EQ(ANClearAnnos(nullptr, 0, 0), AN_ERR_BADARG);
    Doc bare(PlainDocument(2));
    EXPECT_EQ(ANClearAnnos(bare, 0, 0), AN_ERR_NOSTATE);

    Doc doc(NewDoc());
    EXPECT_EQ(ANClearAnnos(doc, 0, 0), AN_OK);
    EXPECT_EQ(TableOf(doc), nullptr);
    antk::failCall(antk::Fn::DAGetAnno, 1, 77);
    EXPECT_EQ(ANClearAnnos(doc, 0, 0), 77u);
}

TEST_F(ClearAnnosTest, FlagsAndValueSelectTheEntriesToRemove) {
    const std::vector<uint32_t> tags = {2, 4, 6, 7, 14, 0x80000007, 0x80000000};
    struct Case {
        uint16_t flags;
        uint32_t value;
        std::vector<uint32_t> removed;
    };
    const Case cases[] = {
        {0, 0, {2, 4, 6, 7, 14}},  // everything without bit 31
        {0, 0x80000000, {2, 4, 6, 7, 14}},
        {ANCLEAR_EQUAL, 7, {7}},
        {ANCLEAR_EQUAL, 0x80000007, {0x80000007}},  // bit 31 gives no protection
        {ANCLEAR_MASK, 6, {6, 7, 14, 0x80000007}},
        {ANCLEAR_MASK, 0x80000000, {0x80000007, 0x80000000}},
        {ANCLEAR_EQUAL | ANCLEAR_MASK, 6, {6}},  // equality wins
        {ANCLEAR_EQUAL | 0x0001, 4, {4}},        // other bits are ignored
        {0x0001, 6, {}},
        {0x4000, 0, {}},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(::testing::Message() << "flags " << c.flags << " value " << c.value);
        Doc doc(NewDoc());
        for (size_t i = 0; i < tags.size(); ++i) {
            ASSERT_EQ(AddPoint(doc, Pos(static_cast<uint32_t>(i)), tags[i]), AN_OK);
        }
        Recorder recorder;
        recorder.Listen(doc);
        EXPECT_EQ(ANClearAnnos(doc, c.flags, c.value), AN_OK);
        EXPECT_EQ(Tags(doc), Without(tags, c.removed));
        EXPECT_EQ(recorder.RemovedTags(), c.removed) << "announced once each, in list order";
        EXPECT_TRUE(StoreHolds(doc));
    }
}

TEST_F(ClearAnnosTest, ClearingEveryEntryFreesTheTableAndTheNextAdditionMakesANewOne) {
    Doc doc(NewDoc());
    for (uint32_t i = 0; i < 12; ++i) ASSERT_EQ(AddPoint(doc, Pos(i % 8), 1), AN_OK);
    ASSERT_EQ(TableOf(doc)->capacity, 20);
    ASSERT_EQ(ANClearAnnos(doc, 0, 0), AN_OK);
    EXPECT_EQ(TableOf(doc), nullptr);
    EXPECT_EQ(ANClearAnnos(doc, 0, 0), AN_OK) << "clearing a document without a table";

    ASSERT_EQ(AddPoint(doc, Pos(3), 1), AN_OK);
    const ANEntryTable *table = TableOf(doc);
    ASSERT_NE(table, nullptr);
    EXPECT_EQ(table->capacity, 10);
    EXPECT_EQ(table->count, 1);
    EXPECT_EQ(table->first, 0);
    EXPECT_EQ(table->freeFirst, 1);
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, RemovedSlotsGoToTheFrontOfTheFreeListAndLiftTheFullMark) {
    Doc doc(NewDoc());
    for (uint32_t i = 0; i < 4; ++i) ASSERT_EQ(AddPoint(doc, Pos(i), 10 + i), AN_OK);
    ANEntryTable *table = MutableTable(doc);
    const uint16_t slot = ListedEntries(doc)[2].slot;
    table->full = 1;  // as a table at its last capacity would be
    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 12), AN_OK);
    EXPECT_EQ(table->full, 0u);
    EXPECT_EQ(table->count, 3);
    EXPECT_EQ(table->freeFirst, slot);
    EXPECT_TRUE(StoreHolds(doc));
    ASSERT_EQ(AddPoint(doc, Pos(5), 20), AN_OK) << "insertion works again";
    EXPECT_EQ(Tagged(ListedEntries(doc), 20)->slot, slot) << "the freed slot is reused first";
}

TEST_F(ClearAnnosTest, ReturnsTheLastCallbackResultAndZeroWhenNothingIsRemoved) {
    struct Case {
        std::vector<uint32_t> results;
        uint32_t expected;
    };
    for (const Case &c : {Case{{5}, 5}, Case{{9, 0}, 0}, Case{{0, 9}, 9}}) {
        Doc doc(NewDoc());
        ASSERT_EQ(AddPoint(doc, Pos(1), 3), AN_OK);
        ASSERT_EQ(AddPoint(doc, Pos(2), 4), AN_OK);
        ASSERT_EQ(AddPoint(doc, Pos(3), 3), AN_OK);
        Recorder recorder;
        recorder.results = c.results;
        recorder.Listen(doc);
        EXPECT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 99), AN_OK) << "nothing selected";
        EXPECT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 3), c.expected);
        EXPECT_EQ(recorder.calls.size(), 2u) << "a callback result does not stop the walk";
        EXPECT_EQ(Tags(doc), std::vector<uint32_t>{4});
        EXPECT_TRUE(StoreHolds(doc));
    }
}

TEST_F(ClearAnnosTest, CallbackSeesTheRemovedEntryAlreadyOutOfTheTable) {
    Doc doc(NewDoc());
    ANAnnoRecord given{};
    given.size = AN_RECORD_SIZE_POINT;
    given.tag = 5;
    given.start = Pos(2);
    given.end = Pos(4);
    given.eventMask = 3;
    given.userData = 0x77;
    given.value = 0x1234;
    given.style = 9;
    ASSERT_EQ(ANAddAnno(doc, AN_TYPE_HILITE, &given), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(3), 6, 0, AN_TYPE_VALUE), AN_OK);
    Recorder recorder;
    recorder.Listen(doc);
    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 5), AN_OK);
    ASSERT_EQ(recorder.calls.size(), 1u);
    const cleartest::Removal &call = recorder.calls[0];
    EXPECT_EQ(call.code, ANNOTIFY_REMOVED);
    EXPECT_EQ(call.type, AN_TYPE_HILITE);
    EXPECT_EQ(call.record.start, Pos(2));
    EXPECT_EQ(call.record.end, Pos(4));
    EXPECT_EQ(call.record.userData, 0x77u);
    EXPECT_EQ(call.record.value, 0x1234u);
    EXPECT_EQ(call.record.style, 9u);
    EXPECT_TRUE(call.slotFree);
    EXPECT_EQ(call.countAtCall, 1);
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, RemovingTheHoveredEntryResetsTheHoverState) {
    Doc doc(NewDoc());
    for (uint32_t i = 0; i < 3; ++i) ASSERT_EQ(AddPoint(doc, Pos(i), 1 + i), AN_OK);
    ANInstance *state = StateOf(doc);
    state->hoverEntry = Tagged(ListedEntries(doc), 2)->slot;
    state->hoverPos = Pos(1, 0);
    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 3), AN_OK);
    EXPECT_EQ(state->hoverEntry, Tagged(ListedEntries(doc), 2)->slot) << "another entry went";
    EXPECT_EQ(state->hoverPos, Pos(1, 0));
    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
    EXPECT_EQ(state->hoverEntry, AN_NONE);
    EXPECT_EQ(state->hoverPos.itemId, kNo);
    EXPECT_EQ(state->hoverPos.subItemId, kNo);
    EXPECT_TRUE(StoreHolds(doc));
}

// ---- Annotation text ------------------------------------------------------------

TEST_F(ClearAnnosTest, RemovedTextMovesLaterPositionsDownAndLeavesEarlierOnes) {
    Doc doc(NewDoc());
    // Units at the anchor: a # c d e # g h, the type-5 entry tagged 3 holding 2..4.
    ASSERT_EQ(AddText(doc, kAnchor, u"a", 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, u"cde", 3), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 4), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, u"gh", 5), AN_OK);
    ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 6), 10), AN_OK);
    ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 1), 11), AN_OK);
    ASSERT_EQ(AddHilite(doc, TextPos(1, kNo, 0), TextPos(1, kNo, 7), 12), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(0), 13), AN_OK);
    ASSERT_EQ(AnchorText(doc, kAnchor), u"a#cde#gh");
    ASSERT_TRUE(StoreHolds(doc));

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 3), AN_OK);
    const auto list = ListedEntries(doc);
    EXPECT_EQ(AnchorText(doc, kAnchor), u"a##gh");
    EXPECT_EQ(Tagged(list, 10)->record.start, TextPos(1, kNo, 3));
    EXPECT_EQ(Tagged(list, 10)->record.end, TextPos(1, kNo, 4));
    EXPECT_EQ(Tagged(list, 11)->record.start, TextPos(1, kNo, 1));
    EXPECT_EQ(Tagged(list, 12)->record.start, TextPos(1, kNo, 0));
    EXPECT_EQ(Tagged(list, 12)->record.end, TextPos(1, kNo, 4));
    EXPECT_EQ(Tagged(list, 4)->record.start, TextPos(1, kNo, 3)) << "placeholder now unit 2";
    EXPECT_EQ(Tagged(list, 1)->record.start, TextPos(1, kNo, 1));
    EXPECT_EQ(Tagged(list, 5)->record.start, kAnchor);
    EXPECT_EQ(Tagged(list, 13)->record.start, Pos(0));
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, AnnotationsInsideRemovedLastTextCollapseOntoTheAnchor) {
    Doc doc(NewDoc());
    ASSERT_EQ(AddText(doc, kAnchor, u"abcd", 1), AN_OK);
    ASSERT_EQ(AddHilite(doc, TextPos(1, kNo, 1), TextPos(1, kNo, 2), 2), AN_OK);
    ASSERT_EQ(AddHilite(doc, TextPos(1, kNo, 2), Pos(3), 3), AN_OK);
    ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 3), 4), AN_OK);  // the last unit
    ASSERT_EQ(AddCutMark(doc, TextPos(1, kNo, 0), 5), AN_OK);
    ASSERT_EQ(AddHilite(doc, Pos(0), TextPos(1, kNo, 2), 6), AN_OK);
    ASSERT_TRUE(StoreHolds(doc));
    Recorder recorder;
    recorder.Listen(doc);
    StateOf(doc)->hoverEntry = Tagged(ListedEntries(doc), 2)->slot;

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 1), AN_OK);
    EXPECT_EQ(recorder.RemovedTags(), std::vector<uint32_t>{1}) << "the rest go silently";
    const auto list = ListedEntries(doc);
    EXPECT_EQ(Tagged(list, 2), nullptr) << "a highlight left covering nothing";
    EXPECT_EQ(Tagged(list, 5), nullptr) << "a cut marker left covering nothing";
    EXPECT_EQ(StateOf(doc)->hoverEntry, AN_NONE) << "a silent release also ends the hover";
    ASSERT_NE(Tagged(list, 3), nullptr);
    EXPECT_EQ(Tagged(list, 3)->record.start, kAnchor);
    EXPECT_EQ(Tagged(list, 3)->record.end, Pos(3));
    ASSERT_NE(Tagged(list, 4), nullptr);
    EXPECT_EQ(Tagged(list, 4)->record.start, kAnchor);
    EXPECT_EQ(Tagged(list, 4)->record.end, kAfterAnchor) << "a point keeps a one-step extent";
    ASSERT_NE(Tagged(list, 6), nullptr);
    EXPECT_EQ(Tagged(list, 6)->record.end, kAnchor);
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, TextBeforeARemovedLastUnitBecomesTheLastTextAtItsAnchor) {
    Doc doc(NewDoc());
    ASSERT_EQ(AddText(doc, kAnchor, u"ab", 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
    ASSERT_EQ(Tagged(ListedEntries(doc), 1)->record.start, TextPos(1, kNo, 2));

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
    const auto list = ListedEntries(doc);
    ASSERT_EQ(list.size(), 1u);
    EXPECT_EQ(list[0].record.start, kAnchor);
    EXPECT_EQ(list[0].record.end, kAfterAnchor) << "its end, moved down into the text, is mended";
    EXPECT_EQ(list[0].text, u"ab");
    EXPECT_TRUE(StoreHolds(doc));
    ASSERT_EQ(AddText(doc, kAnchor, u"c", 3), AN_OK) << "appending still finds it";
    EXPECT_EQ(AnchorText(doc, kAnchor), u"abc");
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, PositionsInsideRemovedInnerTextCollapseToWhereItsUnitsBegan) {
    Doc doc(NewDoc());
    // a b # c d e #: the entry tagged 3 holds units 3..5 and is not the last text.
    ASSERT_EQ(AddText(doc, kAnchor, u"ab", 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, u"cde", 3), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 4), AN_OK);
    ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 4), 10), AN_OK);
    ASSERT_EQ(AddHilite(doc, TextPos(1, kNo, 3), TextPos(1, kNo, 5), 11), AN_OK);
    ASSERT_EQ(AddHilite(doc, TextPos(1, kNo, 1), TextPos(1, kNo, 4), 12), AN_OK);
    ASSERT_EQ(AddHilite(doc, TextPos(1, kNo, 4), Pos(2), 13), AN_OK);
    ASSERT_EQ(AnchorText(doc, kAnchor), u"ab#cde#");
    ASSERT_EQ(Tagged(ListedEntries(doc), 2)->record.start, TextPos(1, kNo, 3));

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 3), AN_OK);
    const auto list = ListedEntries(doc);
    EXPECT_EQ(AnchorText(doc, kAnchor), u"ab##");
    EXPECT_EQ(Tagged(list, 2)->record.start, TextPos(1, kNo, 3))
        << "the text before stays in place";
    EXPECT_EQ(Tagged(list, 2)->record.end, TextPos(1, kNo, 4));
    EXPECT_EQ(Tagged(list, 10)->record.start, TextPos(1, kNo, 3));
    EXPECT_EQ(Tagged(list, 10)->record.end, TextPos(1, kNo, 4));
    EXPECT_EQ(Tagged(list, 11), nullptr);
    EXPECT_EQ(Tagged(list, 12)->record.start, TextPos(1, kNo, 1));
    EXPECT_EQ(Tagged(list, 12)->record.end, TextPos(1, kNo, 3));
    EXPECT_EQ(Tagged(list, 13)->record.start, TextPos(1, kNo, 3));
    EXPECT_EQ(Tagged(list, 4)->record.start, kAnchor);
    for (const Listed &view : list) {
        EXPECT_LT(ANCompPos(&view.record.start, &view.record.end), 1) << "tag " << view.record.tag;
    }
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, TextAtACharacterIsRenumberedPastAnnotationsOnItsItem) {
    antk::DocumentBuilder builder;
    builder.item(antk::kItemParagraph);
    const uint32_t textItem = builder.textItem("xyz");
    builder.item(antk::kItemParagraph);
    const uint32_t c1 = builder.charIds(textItem)[1];
    Doc doc(builder.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const ANPos anchor = Pos(textItem, c1);
    ASSERT_EQ(AddText(doc, anchor, u"ab", 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, anchor, 2), AN_OK);
    ASSERT_EQ(AddText(doc, anchor, u"cd", 3), AN_OK);
    ASSERT_EQ(AddPoint(doc, TextPos(textItem, c1, 4), 4), AN_OK);  // on 'd'
    // A highlight on the item itself sorts before its characters' text.
    ASSERT_EQ(AddHilite(doc, Pos(textItem), Pos(textItem + 1), 5), AN_OK);
    ASSERT_EQ(Tags(doc).front(), 5u);

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
    const auto list = ListedEntries(doc);
    EXPECT_EQ(Tagged(list, 4)->record.start, TextPos(textItem, c1, 3));
    EXPECT_EQ(Tagged(list, 1)->text, u"abcd");
    EXPECT_EQ(Tagged(list, 1)->record.start, anchor);
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, TextAtCharacterZeroIsFoundPastAnnotationsOnItsItem) {
    // Text at a text item's character 0 sorts before the item itself, its content
    // position after it: annotations on the item lie between the two in the list.
    uint32_t textItem = 0;
    auto build = [&](const char *name) {
        antk::DocumentBuilder builder;
        textItem = builder.textItem("xyz");
        builder.item(antk::kItemParagraph);
        EXPECT_EQ(builder.charIds(textItem)[0], 0u) << name;
        return builder.build();
    };
    auto annotate = [&](Doc &doc) {
        const ANPos anchor = Pos(textItem, 0);
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        ASSERT_EQ(AddText(doc, anchor, u"ab", 1), AN_OK);
        ASSERT_EQ(AddPlaceholder(doc, anchor, 2), AN_OK);
        ASSERT_EQ(AddText(doc, anchor, u"cd", 3), AN_OK);
        ASSERT_EQ(AddPoint(doc, TextPos(textItem, 0, 1), 4), AN_OK);  // on 'b'
        ASSERT_EQ(AddPoint(doc, TextPos(textItem, 0, 4), 6), AN_OK);  // on 'd'
        ASSERT_EQ(AddHilite(doc, Pos(textItem), Pos(textItem + 1), 5), AN_OK);
        ASSERT_EQ(Tags(doc), (std::vector<uint32_t>{4, 1, 2, 6, 5, 3}));
    };
    {
        Doc doc(build("last text removed"));
        annotate(doc);
        const ANPos anchor = Pos(textItem, 0);
        ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 3), AN_OK);
        EXPECT_EQ(AnchorText(doc, anchor), u"ab#");
        const auto list = ListedEntries(doc);
        EXPECT_EQ(Tagged(list, 2)->record.start, anchor) << "the placeholder is now last";
        EXPECT_EQ(Tagged(list, 1)->record.start, TextPos(textItem, 0, 2));
        EXPECT_EQ(Tagged(list, 6)->record.start, anchor);
        EXPECT_TRUE(StoreHolds(doc));
    }
    {
        Doc doc(build("placeholder removed"));
        annotate(doc);
        const ANPos anchor = Pos(textItem, 0);
        ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
        EXPECT_EQ(AnchorText(doc, anchor), u"abcd");
        const auto list = ListedEntries(doc);
        EXPECT_EQ(Tagged(list, 3), nullptr) << "joined";
        EXPECT_EQ(Tagged(list, 1)->record.start, anchor);
        EXPECT_EQ(Tagged(list, 6)->record.start, TextPos(textItem, 0, 3));
        EXPECT_EQ(Tags(doc), (std::vector<uint32_t>{4, 6, 5, 1}));
        EXPECT_TRUE(StoreHolds(doc));
    }
}

TEST_F(ClearAnnosTest, EmptyTextEntriesKeepTheLayout) {
    // "abc", a placeholder, and an empty last text of the same tag: what splitting a
    // text at its very end leaves.
    auto split = [](Doc &doc) {
        ASSERT_EQ(AddText(doc, kAnchor, u"abc", 1), AN_OK);
        ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
        ASSERT_EQ(AddText(doc, kAnchor, u"d", 1), AN_OK);
        ANEntryTable *table = MutableTable(doc);
        ANSlot(table, table->last).record.textLength = 0;
        ASSERT_TRUE(StoreHolds(doc));
    };
    {
        Doc doc(NewDoc());
        split(doc);
        ASSERT_EQ(AddPlaceholder(doc, kAnchor, 3), AN_OK);
        ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 3), 4), AN_OK);
        ASSERT_TRUE(StoreHolds(doc));
        ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 3), AN_OK);
        EXPECT_EQ(AnchorText(doc, kAnchor), u"abc#");
        const auto list = ListedEntries(doc);
        EXPECT_EQ(Tagged(list, 2)->record.start, TextPos(1, kNo, 4))
            << "the placeholder keeps its place; the empty text behind it is last";
        EXPECT_EQ(list.back().record.start, kAnchor);
        EXPECT_TRUE(StoreHolds(doc));
    }
    {
        Doc doc(NewDoc());
        split(doc);
        ASSERT_EQ(AddHilite(doc, TextPos(1, kNo, 3), Pos(3), 5), AN_OK);  // from the placeholder
        ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
        EXPECT_EQ(AnchorText(doc, kAnchor), u"abc");
        EXPECT_EQ(Tags(doc), (std::vector<uint32_t>{5, 1})) << "joined with the empty text";
        EXPECT_EQ(ListedEntries(doc).back().record.start, kAnchor);
        EXPECT_TRUE(StoreHolds(doc));
    }
    {
        // Both halves share the tag; the empty one goes last and leaves the
        // placeholder as the last text.
        Doc doc(NewDoc());
        split(doc);
        ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 1), AN_OK);
        const auto list = ListedEntries(doc);
        ASSERT_EQ(list.size(), 1u);
        EXPECT_EQ(list[0].record.start, kAnchor);
        EXPECT_EQ(list[0].record.end, kAfterAnchor);
        EXPECT_TRUE(StoreHolds(doc));
    }
}

// ---- Joining two texts ------------------------------------------------------------

TEST_F(ClearAnnosTest, RemovedPlaceholderJoinsTheTextsAroundIt) {
    Doc doc(NewDoc());
    ASSERT_EQ(AddText(doc, kAnchor, u"ab", 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, u"cde", 3), AN_OK);
    ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 4), 4), AN_OK);  // on 'd'
    ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 2), 5), AN_OK);  // on the placeholder
    ASSERT_EQ(AddPoint(doc, kAnchor, 6), AN_OK);
    ASSERT_EQ(AddHilite(doc, TextPos(1, kNo, 1), TextPos(1, kNo, 5), 7), AN_OK);
    ASSERT_EQ(AnchorText(doc, kAnchor), u"ab#cde");
    Recorder recorder;
    recorder.anchor = kAnchor;
    recorder.Listen(doc);
    StateOf(doc)->hoverEntry = Tagged(ListedEntries(doc), 3)->slot;

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
    ASSERT_EQ(recorder.calls.size(), 1u) << "the later text goes without a callback";
    EXPECT_EQ(recorder.calls[0].type, AN_TYPE_PLACEHOLDER);
    EXPECT_EQ(recorder.calls[0].anchorText, u"abcde") << "joined before the announcement";
    EXPECT_EQ(StateOf(doc)->hoverEntry, AN_NONE);

    const auto list = ListedEntries(doc);
    EXPECT_EQ(Tagged(list, 3), nullptr);
    const Listed *joined = Tagged(list, 1);
    ASSERT_NE(joined, nullptr);
    EXPECT_EQ(joined->text, u"abcde");
    EXPECT_EQ(joined->record.textCapacity, 64u);
    EXPECT_EQ(joined->record.start, kAnchor) << "it is now the last text at the anchor";
    EXPECT_EQ(joined->record.end, kAfterAnchor);
    EXPECT_EQ(Tagged(list, 4)->record.start, TextPos(1, kNo, 3));
    EXPECT_EQ(Tagged(list, 5)->record.start, TextPos(1, kNo, 2));
    EXPECT_EQ(Tagged(list, 7)->record.end, TextPos(1, kNo, 4));
    EXPECT_EQ(Tags(doc), (std::vector<uint32_t>{7, 5, 4, 1, 6}))
        << "annotations inside the joined text come before it";
    EXPECT_TRUE(StoreHolds(doc));

    ASSERT_EQ(AddText(doc, kAnchor, u"f", 8), AN_OK) << "appends to the joined text";
    EXPECT_EQ(AnchorText(doc, kAnchor), u"abcdef");
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, JoinKeepsTheEarlierTextAsTheInnerTextWhenMoreTextFollows) {
    Doc doc(NewDoc());
    ASSERT_EQ(AddText(doc, kAnchor, u"ab", 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, u"cd", 3), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 4), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, u"f", 5), AN_OK);

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
    const auto list = ListedEntries(doc);
    EXPECT_EQ(AnchorText(doc, kAnchor), u"abcd#f");
    EXPECT_EQ(Tagged(list, 1)->record.start, TextPos(1, kNo, 4)) << "just after its own units";
    EXPECT_EQ(Tagged(list, 1)->record.end, TextPos(1, kNo, 5));
    EXPECT_EQ(Tagged(list, 4)->record.start, TextPos(1, kNo, 5));
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, JoinGrowsTheBufferInStepsOfSixtyFourUnits) {
    Doc doc(NewDoc());
    const std::u16string first(40, u'x');
    const std::u16string second(24, u'y');  // 64 units together
    ASSERT_EQ(AddText(doc, kAnchor, first, 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, second, 3), AN_OK);
    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
    const auto list = ListedEntries(doc);
    ASSERT_EQ(list.size(), 1u);
    EXPECT_EQ(list[0].text, first + second);
    EXPECT_EQ(list[0].record.textCapacity, 128u) << "always more room than text";
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, WalkGoesOnAfterAnEntryReleasedWithTheRemovedOne) {
    Doc doc(NewDoc());
    // The later text follows the placeholder directly: the join takes it, and the
    // walk must go on behind it.
    ASSERT_EQ(AddText(doc, kAnchor, u"ab", 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, u"cd", 3), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(2), 2), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(3), 3), AN_OK);
    // A highlight covering nothing, right behind a removed last text, is released by
    // the renumbering; the selected point behind it must still be reached.
    ASSERT_EQ(AddText(doc, Pos(5), u"z", 4), AN_OK);
    ASSERT_EQ(AddHilite(doc, Pos(5), Pos(5), 5), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(5), 4), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(6), 6), AN_OK);
    Recorder recorder;
    recorder.Listen(doc);

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
    EXPECT_EQ(recorder.RemovedTags(), (std::vector<uint32_t>{2, 2}));
    EXPECT_EQ(Tags(doc), (std::vector<uint32_t>{1, 3, 4, 5, 4, 6}));
    EXPECT_EQ(AnchorText(doc, kAnchor), u"abcd");
    EXPECT_TRUE(StoreHolds(doc));

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 4), AN_OK);
    EXPECT_EQ(recorder.RemovedTags(), (std::vector<uint32_t>{2, 2, 4, 4}));
    EXPECT_EQ(Tags(doc), (std::vector<uint32_t>{1, 3, 6}));
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, LaterTextThatTheClearSelectsIsRemovedInItsTurnNotJoined) {
    Doc doc(NewDoc());
    ASSERT_EQ(AddText(doc, kAnchor, u"ab", 1), AN_OK);
    ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
    ASSERT_EQ(AddText(doc, kAnchor, u"cd", 2), AN_OK);
    ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 3), 3), AN_OK);  // on 'c'
    Recorder recorder;
    recorder.Listen(doc);

    ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
    EXPECT_EQ(recorder.RemovedTags(), (std::vector<uint32_t>{2, 2}));
    ASSERT_EQ(recorder.calls.size(), 2u);
    EXPECT_EQ(recorder.calls[1].type, AN_TYPE_TEXT);
    EXPECT_EQ(AnchorText(doc, kAnchor), u"ab") << "no text of tag 2 outlives the clear";
    const auto list = ListedEntries(doc);
    EXPECT_EQ(Tagged(list, 1)->record.start, kAnchor);
    EXPECT_EQ(Tagged(list, 3)->record.start, kAnchor) << "collapsed with its text";
    EXPECT_TRUE(StoreHolds(doc));
}

TEST_F(ClearAnnosTest, JoinOutOfMemoryReportsThirteenAndLeavesTheTextsApart) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    const std::u16string first(40, u'x');
    const std::u16string second(30, u'y');
    auto build = [&](Doc &doc) {
        ASSERT_EQ(AddText(doc, kAnchor, first, 1), AN_OK);
        ASSERT_EQ(AddPlaceholder(doc, kAnchor, 2), AN_OK);
        ASSERT_EQ(AddText(doc, kAnchor, second, 3), AN_OK);
        ASSERT_EQ(AddPoint(doc, TextPos(1, kNo, 45), 4), AN_OK);
    };
    uint64_t allocations = 0;
    {
        Doc doc(NewDoc());
        build(doc);
        anwin::resetCounters();
        ASSERT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_OK);
        allocations = anwin::allocations();
    }
    ASSERT_GE(allocations, 1u);
    for (uint64_t n = 1; n <= allocations; ++n) {
        SCOPED_TRACE(::testing::Message() << "allocation " << n);
        Doc doc(NewDoc());
        build(doc);
        anwin::failAllocation(n);
        EXPECT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), AN_ERR_NOMEM);
        anwin::clearFailures();
        const auto list = ListedEntries(doc);
        ASSERT_EQ(list.size(), 3u) << "the placeholder alone is gone";
        const Listed *kept = Tagged(list, 1);
        const Listed *later = Tagged(list, 3);
        ASSERT_NE(kept, nullptr);
        ASSERT_NE(later, nullptr);
        EXPECT_EQ(kept->text, first);
        EXPECT_EQ(kept->record.textCapacity, 64u);
        EXPECT_EQ(kept->record.start, TextPos(1, kNo, 40));
        EXPECT_EQ(later->text, second);
        EXPECT_EQ(later->record.start, kAnchor);
        EXPECT_EQ(Tagged(list, 4)->record.start, TextPos(1, kNo, 44)) << "renumbering stays done";
        EXPECT_EQ(AnchorText(doc, kAnchor), first + second);
        EXPECT_TRUE(StoreHolds(doc));
    }
    {
        // A callback that runs after the failure decides the result.
        Doc doc(NewDoc());
        build(doc);
        Recorder recorder;
        recorder.results = {7};
        recorder.Listen(doc);
        anwin::failAllocation(1);
        EXPECT_EQ(ANClearAnnos(doc, ANCLEAR_EQUAL, 2), 7u);
        anwin::clearFailures();
        EXPECT_EQ(ListedEntries(doc).size(), 3u);
        EXPECT_TRUE(StoreHolds(doc));
    }
#endif
}

}  // namespace
