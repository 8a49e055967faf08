// The one order of content and annotation-text positions.
#include <gtest/gtest.h>

#include <random>
#include <tuple>
#include <vector>

#include "support/fixture.h"

namespace {

using annotest::Pos;
using annotest::TextPos;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;

int Cmp(const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b); }

struct OrderCase {
    ANPos before;
    ANPos after;
};

TEST(PositionOrder, NamedCasesSortAsDocumentedBothWays) {
    const OrderCase cases[] = {
        {Pos(7, kNo), Pos(7, 0)},  // the item before its characters
        {Pos(7, 0), Pos(7, 1)},
        {Pos(7, kNo), Pos(7, 0xFFFFFFFE)},  // normalised 0 is smallest
        {Pos(1, 0), Pos(0x80000000, 0)},    // itemId is unsigned
        {TextPos(7, 3, 9), Pos(7, 3)},      // text before content at one anchor
        {TextPos(7, 3, 1), TextPos(7, 3, 2)},
        {TextPos(7, 0, 2), Pos(7, kNo)},  // text at (7,0) before the item itself
        {TextPos(7, kNo, 900), Pos(7, kNo)},
        {Pos(7, 5), TextPos(7, 6, 0)},
        {Pos(6, 0xFFFFFFFE), TextPos(7, kNo, 0)},
    };
    for (const OrderCase &c : cases) {
        EXPECT_EQ(Cmp(c.before, c.after), -1)
            << ::testing::PrintToString(c.before) << " vs " << ::testing::PrintToString(c.after);
        EXPECT_EQ(Cmp(c.after, c.before), 1);
    }
}

TEST(PositionOrder, PositionsThatDifferOnlyInUnusedFieldsSortEqual) {
    EXPECT_EQ(Cmp(TextPos(7, 3, 2), TextPos(7, 3, 2)), 0);
    EXPECT_EQ(Cmp(TextPos(7, kNo, 2), TextPos(7, 0, 2)), 0) << "one anchor for text";
    EXPECT_EQ(Cmp(Pos(7, 3, 0, 0), Pos(7, 3, 4, 8)), 0) << "only kind 5 is special";
    EXPECT_EQ(Cmp(Pos(7, kNo, 1, 1), Pos(7, kNo, 6, 99)), 0);
}

TEST(PositionOrder, AnnoTextTestLooksOnlyAtKindFive) {
    for (uint32_t kind : {0u, 4u, 6u, 0xFFFFFFFFu}) {
        const ANPos p = Pos(1, 1, kind, 0);
        EXPECT_EQ(ANIsAnnoTextPos(&p), 0u) << kind;
    }
    const ANPos t = TextPos(1, 1, 0);
    EXPECT_EQ(ANIsAnnoTextPos(&t), 1u);
}

// The order as a key: (itemId; normalised subItemId; text first; textIndex for
// text, else the item itself before its first character).
std::tuple<uint32_t, uint32_t, int, uint32_t> Key(const ANPos &p) {
    const uint32_t sub = p.subItemId == kNo ? 0 : p.subItemId;
    const bool text = p.kind == ANPOS_ANNOTEXT;
    const uint32_t last = text ? p.textIndex : (p.subItemId == kNo ? 0u : 1u);
    return {p.itemId, sub, text ? 0 : 1, last};
}

std::vector<ANPos> GeneratedPositions() {
    // Small value sets so that ties and boundaries meet often.
    const uint32_t items[] = {0, 1, 2, 0x80000000u, 0xFFFFFFFFu};
    const uint32_t subs[] = {kNo, 0, 1, 2, 0xFFFFFFFEu};
    const uint32_t kinds[] = {0, 5, 4, 6};
    const uint32_t indices[] = {0, 1, 7, 0xFFFFFFFFu};
    std::vector<ANPos> out;
    for (uint32_t i : items)
        for (uint32_t s : subs)
            for (uint32_t k : kinds)
                for (uint32_t t : indices) out.push_back(Pos(i, s, k, t));
    return out;
}

TEST(PositionOrder, AgreesWithTheKeyAndIsAntisymmetric) {
    const std::vector<ANPos> all = GeneratedPositions();
    for (const ANPos &a : all) {
        for (const ANPos &b : all) {
            const auto ka = Key(a);
            const auto kb = Key(b);
            const int expected = ka < kb ? -1 : (kb < ka ? 1 : 0);
            const int got = Cmp(a, b);
            ASSERT_EQ(got, expected)
                << ::testing::PrintToString(a) << " vs " << ::testing::PrintToString(b);
            ASSERT_EQ(Cmp(b, a), -got);
        }
    }
}

TEST(PositionOrder, IsTransitiveOverRandomTriples) {
    const std::vector<ANPos> all = GeneratedPositions();
    std::mt19937 rng(12345);
    std::uniform_int_distribution<size_t> pick(0, all.size() - 1);
    for (int n = 0; n < 200000; ++n) {
        const ANPos &a = all[pick(rng)];
        const ANPos &b = all[pick(rng)];
        const ANPos &c = all[pick(rng)];
        if (Cmp(a, b) <= 0 && Cmp(b, c) <= 0) {
            ASSERT_LE(Cmp(a, c), 0)
                << ::testing::PrintToString(a) << " " << ::testing::PrintToString(b) << " "
                << ::testing::PrintToString(c);
        }
    }
}

}  // namespace
