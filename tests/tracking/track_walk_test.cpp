// Whole tracking walks over generated annotation sets, checked position by position
// against a brute-force reading of which entries cover each position.
#include <gtest/gtest.h>

#include <algorithm>
#include <numeric>
#include <random>
#include <vector>

#include "positions/order.h"
#include "support/fixture.h"
#include "tracking/hand_table.h"
#include "tracking/walk_check.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;
using tracktest::HandEntry;

// A document of plain items and text items, and every position a walk over it may
// visit: at each anchor a few annotation-text positions, then the content position.
struct WalkDocument {
    DAHandle handle;
    std::vector<ANPos> positions;
};

WalkDocument MakeWalkDocument(std::mt19937 &rng, uint32_t textPerAnchor) {
    antk::DocumentBuilder builder(6);
    std::uniform_int_distribution<int> kind(0, 2);
    std::vector<uint32_t> textItems;
    for (int i = 0; i < 8; ++i) {
        if (kind(rng) == 0) {
            textItems.push_back(builder.textItem(std::string_view("abc").substr(0, 1 + i % 3)));
        } else {
            builder.item(antk::kItemParagraph);
        }
    }
    WalkDocument doc{builder.build(), {}};
    for (const antk::ItemView &item : antk::items(doc.handle)) {
        std::vector<uint32_t> subs{ANPOS_NOSUBITEM};
        for (uint32_t c = 0; c < item.charCount; ++c) subs.push_back(item.firstChar + c);
        for (uint32_t sub : subs) {
            for (uint32_t k = 0; k < textPerAnchor; ++k) {
                doc.positions.push_back(TextPos(item.id, sub, k));
            }
            doc.positions.push_back(Pos(item.id, sub));
        }
    }
    // Text at an item's first character (id 0) shares the anchor of the item's own text.
    auto before = [](const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b) < 0; };
    auto same = [](const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b) == 0; };
    std::stable_sort(doc.positions.begin(), doc.positions.end(), before);
    doc.positions.erase(std::unique(doc.positions.begin(), doc.positions.end(), same),
                        doc.positions.end());
    return doc;
}

uint32_t RandomStyleWord(std::mt19937 &rng) {
    const uint32_t bits = rng();
    if (bits % 3 == 0) return ANSTYLEWORD_NUMBER | (bits & 0xBFFF0000u) | (1 + (bits >> 8) % 6);
    return bits & ~ANSTYLEWORD_NUMBER;
}

// Up to `n` entries of every type over `positions`, in start order, in shuffled slots.
std::vector<HandEntry> RandomEntries(std::mt19937 &rng, const std::vector<ANPos> &positions,
                                     int n) {
    std::uniform_int_distribution<size_t> at(0, positions.size() - 1);
    std::uniform_int_distribution<int> type(1, 7);
    std::vector<HandEntry> entries;
    for (int i = 0; i < n; ++i) {
        const uint16_t t = static_cast<uint16_t>(type(rng));
        const ANPos start = positions[at(rng)];
        const uint64_t user = 0x1000 + i;
        const uint64_t value = 0x2000 + i;
        ANAnnoRecord record;
        if (t == AN_TYPE_HILITE || t == AN_TYPE_RANGE) {
            size_t a = at(rng), b = at(rng);
            if (a > b) std::swap(a, b);
            const ANPos end = rng() % 10 == 0 ? Pos(0xFFFFFFF0) : positions[b];
            record = tracktest::Rec(positions[a], end, user, value, RandomStyleWord(rng));
        } else if (t == AN_TYPE_TEXT) {
            record = tracktest::TextRec(start, ANStepAfter(start), u"xy", user);
        } else {
            record = tracktest::Rec(start, ANStepAfter(start), user, value);
        }
        entries.push_back({0, t, record});
    }
    std::stable_sort(entries.begin(), entries.end(), [](const HandEntry &a, const HandEntry &b) {
        return ANCompPos(&a.record.start, &b.record.start) < 0;
    });
    std::vector<uint16_t> slots(entries.size() + rng() % 5);
    std::iota(slots.begin(), slots.end(), 0);
    std::shuffle(slots.begin(), slots.end(), rng);
    for (size_t i = 0; i < entries.size(); ++i) entries[i].slot = slots[i];
    return entries;
}

class TrackWalkTest : public annotest::LeakCheckedTest {
 protected:
    void SetUp() override {
        LeakCheckedTest::SetUp();
        ASSERT_EQ(ANInitGlobalHiliteStyles(&global_), AN_OK);
        for (uint32_t id = 1; id <= 4; ++id) {
            const ANHiliteStyle s{ANHILITESTYLE_SIZE,        id, id, 0x100 * id, 0x10000 * id,
                                  static_cast<uint16_t>(id), 0,  0};
            ASSERT_EQ(ANAddGlobalHiliteStyle(global_, &s), AN_OK);
        }
    }
    void TearDown() override {
        ANDeInitGlobalHiliteStyles(global_);
        LeakCheckedTest::TearDown();
    }

    // Styles 3 to 6 in the document's own table: 3 and 4 shadow global ones, 5 and 6
    // exist only here.
    void AddDocumentStyles(DAHandle doc) {
        for (uint32_t id = 3; id <= 6; ++id) {
            const ANHiliteStyle s{ANHILITESTYLE_SIZE, id, 7 - id, 0xABC * id, 0xDEF * id, 9, 8, 0};
            ASSERT_EQ(ANAddHiliteStyle(doc, &s), AN_OK);
        }
    }

    ANStyleTable *global_ = nullptr;
};

TEST_F(TrackWalkTest, GeneratedTablesAgreeWithBruteForceAtEveryPosition) {
    int fullCalls = 0, reports = 0;
    for (uint32_t seed = 1; seed <= 300; ++seed) {
        SCOPED_TRACE("seed " + std::to_string(seed));
        std::mt19937 rng(seed);
        WalkDocument made = MakeWalkDocument(rng, 1 + seed % 3);
        Doc doc(made.handle);
        ASSERT_EQ(ANInit(doc, global_, nullptr, nullptr), AN_OK);
        AddDocumentStyles(doc);
        tracktest::InstallTable(doc, RandomEntries(rng, made.positions, 1 + rng() % 30));

        const ANPos start =
            rng() % 2 == 0 ? made.positions.front() : made.positions[rng() % made.positions.size()];
        const double skip = seed % 4 == 0 ? 0.4 : 0.0;
        const tracktest::WalkStats stats =
            tracktest::CheckWalk(doc, start, made.positions, rng, skip, rng() % 4 == 0);
        fullCalls += stats.fullCalls;
        reports += stats.reports;
        if (::testing::Test::HasFailure()) break;
    }
    EXPECT_GT(fullCalls, 1000);
    EXPECT_GT(reports, 1000);
}

}  // namespace
