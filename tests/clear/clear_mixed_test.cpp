// Long mixed runs of adding and clearing: after every clear the remaining annotation
// text reads as before without the removed units, every annotation on a surviving
// unit still points at that unit, and the table keeps its rules.
#include <gtest/gtest.h>

#include <cstdint>
#include <map>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "clear/clear_support.h"

namespace {

using annotest::Doc;
using annotest::Listed;
using annotest::ListedEntries;
using annotest::Pos;
using annotest::TextPos;
using cleartest::StoreHolds;

constexpr uint32_t kTags = 6;
constexpr uint32_t kTextItem = 2;  // items: 0, 1 plain, 2 text "xyz", 3 plain
constexpr uint32_t kLastItem = 3;
constexpr uint32_t kPlaceholderUnit = 0x10000;  // + slot: a placeholder's identity

class ClearMixedTest : public annotest::LeakCheckedTest {};

using Anchor = std::pair<uint32_t, uint32_t>;

Anchor AnchorOf(const ANPos &pos) { return {pos.itemId, pos.subItemId}; }

// The units at every anchor, in order; a text unit is its (unique) character, a
// placeholder kPlaceholderUnit + its slot.
std::map<Anchor, std::vector<uint32_t>> Units(const std::vector<Listed> &list) {
    std::map<Anchor, std::vector<uint32_t>> units;
    for (const Listed &entry : list) {
        auto &seq = units[AnchorOf(entry.record.start)];
        if (entry.type == AN_TYPE_TEXT) {
            for (char16_t c : entry.text) seq.push_back(c);
        } else if (entry.type == AN_TYPE_PLACEHOLDER) {
            seq.push_back(kPlaceholderUnit + entry.slot);
        }
    }
    return units;
}

// The unit a kind-5 position lies on, or 0 for any other position.
uint32_t UnitAt(const std::map<Anchor, std::vector<uint32_t>> &units, const ANPos &pos) {
    if (pos.kind != ANPOS_ANNOTEXT) return 0;
    const auto it = units.find(AnchorOf(pos));
    if (it == units.end() || pos.textIndex >= it->second.size()) return 0;
    return it->second[pos.textIndex];
}

bool IsText(uint16_t type) { return type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER; }
bool IsRange(uint16_t type) {
    return type == AN_TYPE_HILITE || type == AN_TYPE_RANGE || type == AN_TYPE_CUTMARK;
}

class MixedRun {
 public:
    MixedRun(DAHandle doc, std::vector<ANPos> anchors, uint32_t seed)
        : doc_(doc), anchors_(std::move(anchors)), random_(seed) {}

    void Step() {
        switch (Pick(9)) {
            case 0:
            case 1:
                AddText();
                break;
            case 2:
                AddPlaceholder();
                break;
            case 3:
                AddPoint();
                break;
            case 4:
                AddHilite();
                break;
            case 5:
                AddCutMark();
                break;
            default:
                Clear();
                break;
        }
    }

 private:
    uint32_t Pick(uint32_t n) { return std::uniform_int_distribution<uint32_t>(0, n - 1)(random_); }

    ANPos AnchorPos() { return anchors_[Pick(static_cast<uint32_t>(anchors_.size()))]; }

    uint32_t TextLength(const ANPos &anchor) {
        return static_cast<uint32_t>(Units(ListedEntries(doc_))[AnchorOf(anchor)].size());
    }

    // A place for new text at an anchor: its content position (appending) or an index
    // inside or at the end of its text. Adding may refuse an end index that no text
    // entry ends at (15, nothing changed).
    ANPos TextPlace() {
        const ANPos anchor = AnchorPos();
        const uint32_t length = TextLength(anchor);
        if (length == 0 || Pick(2) == 0) return anchor;
        return TextPos(anchor.itemId, anchor.subItemId, Pick(length + 1));
    }

    // A position on a unit of an anchor's text, or the anchor's content position.
    ANPos UnitPlace() {
        const ANPos anchor = AnchorPos();
        const uint32_t length = TextLength(anchor);
        if (length == 0 || Pick(4) == 0) return anchor;
        return TextPos(anchor.itemId, anchor.subItemId, Pick(length));
    }

    static bool Added(uint32_t rc) { return rc == AN_OK || rc == AN_ERR_BADARG; }

    void AddText() {
        std::u16string text;
        for (uint32_t n = 1 + Pick(3); n > 0; --n) text += static_cast<char16_t>(nextUnit_++);
        ASSERT_TRUE(Added(annotest::AddText(doc_, TextPlace(), text, 1 + Pick(kTags))));
        ASSERT_TRUE(StoreHolds(doc_)) << "after adding text";
    }
    void AddPlaceholder() {
        ASSERT_TRUE(Added(annotest::AddPlaceholder(doc_, TextPlace(), 1 + Pick(kTags))));
        ASSERT_TRUE(StoreHolds(doc_)) << "after adding a placeholder";
    }
    void AddPoint() {
        ASSERT_EQ(annotest::AddPoint(doc_, UnitPlace(), 1 + Pick(kTags)), AN_OK);
        ASSERT_TRUE(StoreHolds(doc_)) << "after adding a point";
    }
    void AddCutMark() {
        ASSERT_EQ(annotest::AddCutMark(doc_, UnitPlace(), 1 + Pick(kTags)), AN_OK);
        ASSERT_TRUE(StoreHolds(doc_)) << "after adding a cut marker";
    }
    void AddHilite() {
        // Some start on the text item itself, which sorts before its characters' text.
        // (Ending those at a character's content position is left out: text added
        // there would pull the end before the item.)
        const bool onItem = Pick(4) == 0;
        const ANPos a = onItem ? Pos(kTextItem) : UnitPlace();
        ANPos b = onItem || Pick(3) == 0 ? Pos(kLastItem) : UnitPlace();
        if (ANCompPos(&a, &b) == 0) b = Pos(kLastItem);  // empty ranges are a matter of adding
        ASSERT_EQ(annotest::AddHilite(doc_, a, b, 1 + Pick(kTags)), AN_OK);
        ASSERT_TRUE(StoreHolds(doc_)) << "after adding a highlight";
    }

    void Clear() {
        const uint32_t tag = 1 + Pick(kTags);
        const std::vector<Listed> before = ListedEntries(doc_);
        const auto unitsBefore = Units(before);
        std::map<Anchor, std::vector<uint32_t>> expected;
        for (const Listed &entry : before) {
            if (!IsText(entry.type) || entry.record.tag == tag) continue;
            auto &seq = expected[AnchorOf(entry.record.start)];
            if (entry.type == AN_TYPE_TEXT) {
                for (char16_t c : entry.text) seq.push_back(c);
            } else {
                seq.push_back(kPlaceholderUnit + entry.slot);
            }
        }

        ASSERT_EQ(ANClearAnnos(doc_, ANCLEAR_EQUAL, tag), AN_OK);
        ASSERT_TRUE(StoreHolds(doc_)) << "after clearing tag " << tag;
        const std::vector<Listed> after = ListedEntries(doc_);
        auto unitsAfter = Units(after);
        // A join takes the later text's placeholder-free units into the earlier entry,
        // which only changes which entry holds them, not their order.
        for (auto &[anchor, seq] : expected) {
            EXPECT_EQ(unitsAfter[anchor], seq) << "text at (" << anchor.first << ", "
                                               << anchor.second << ") after clearing " << tag;
        }

        std::map<uint16_t, const Listed *> survivors;
        for (const Listed &entry : after) survivors[entry.slot] = &entry;
        for (const Listed &entry : before) {
            if (IsText(entry.type)) continue;
            const auto found = survivors.find(entry.slot);
            if (entry.record.tag == tag) {
                EXPECT_EQ(found, survivors.end()) << "a selected entry stayed";
                continue;
            }
            if (found == survivors.end()) {
                EXPECT_TRUE(IsRange(entry.type)) << "a point was lost, type " << entry.type;
                continue;
            }
            const ANAnnoRecord &now = found->second->record;
            ExpectSameUnit(unitsBefore, unitsAfter, entry.record.start, now.start);
            if (IsRange(entry.type)) {
                ExpectSameUnit(unitsBefore, unitsAfter, entry.record.end, now.end);
            } else {
                ANPos step = now.start;
                if (step.kind == ANPOS_ANNOTEXT) {
                    step.textIndex++;
                } else {
                    step.subItemId++;
                }
                EXPECT_EQ(now.end, step) << "a point keeps its one-step extent";
            }
        }
    }

    // A position on a unit that survived the clear still lies on that unit.
    static void ExpectSameUnit(const std::map<Anchor, std::vector<uint32_t>> &before,
                               std::map<Anchor, std::vector<uint32_t>> &after, const ANPos &was,
                               const ANPos &is) {
        const uint32_t unit = UnitAt(before, was);
        if (unit == 0 || !Contains(after[AnchorOf(was)], unit)) return;
        EXPECT_EQ(UnitAt(after, is), unit)
            << ::testing::PrintToString(was) << " became " << ::testing::PrintToString(is);
    }

    static bool Contains(const std::vector<uint32_t> &seq, uint32_t unit) {
        for (uint32_t u : seq) {
            if (u == unit) return true;
        }
        return false;
    }

    DAHandle doc_;
    std::vector<ANPos> anchors_;
    std::mt19937 random_;
    uint32_t nextUnit_ = 0x4E00;
};

TEST_F(ClearMixedTest, ClearsKeepTextOrderPositionsAndTableRulesThroughLongRuns) {
    for (uint32_t seed = 1; seed <= 40; ++seed) {
        SCOPED_TRACE(::testing::Message() << "seed " << seed);
        antk::DocumentBuilder builder;
        builder.item(antk::kItemParagraph);
        builder.item(antk::kItemParagraph);
        ASSERT_EQ(builder.textItem("xyz"), kTextItem);
        ASSERT_EQ(builder.item(antk::kItemParagraph), kLastItem);
        const std::vector<uint32_t> chars = builder.charIds(kTextItem);
        Doc doc(builder.build());
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        MixedRun run(doc, {Pos(1), Pos(kTextItem, chars[1]), Pos(kTextItem, chars[2])}, seed);
        for (int step = 0; step < 120 && !HasFatalFailure() && !HasFailure(); ++step) {
            run.Step();
        }
        ASSERT_FALSE(HasFailure());
    }
}

}  // namespace
