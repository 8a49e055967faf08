// Checks a whole tracking walk against a brute-force reading of the annotation table:
// at every position, which entries cover it (start <= p < end) is computed from all
// entries, and the result bits and the tracking record must agree with it.
#ifndef ANNO_TESTS_TRACKING_WALK_CHECK_H
#define ANNO_TESTS_TRACKING_WALK_CHECK_H

#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <vector>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "store/table.h"
#include "styles/styles.h"
#include "support/fixture.h"
#include "support/invariants.h"
#include "support/track_model.h"

namespace tracktest {

inline int Cmp(const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b); }

// What a style word gives, found the way a viewer would expect: palette colours for a
// direct word, the document's style, then the global one, for a style number.
struct ExpectedStyle {
    uint32_t color1Set = 0, color2Set = 0, attrSet = 0;
    uint32_t color1 = 0, color2 = 0, attr1 = 0, attr2 = 0;
};

inline ExpectedStyle StyleFor(DAHandle doc, uint32_t word) {
    static constexpr uint32_t kPalette[16] = {
        0x000000, 0x000080, 0x008000, 0x008080, 0x800000, 0x800080, 0x808000, 0xC0C0C0,
        0x808080, 0x0000FF, 0x00FF00, 0x00FFFF, 0xFF0000, 0xFF00FF, 0xFFFF00, 0xFFFFFF};
    ExpectedStyle s;
    if ((word & ANSTYLEWORD_NUMBER) == 0) {
        s.color2Set = (word & ANSTYLEWORD_NOCOLOR2) == 0;
        s.color1Set = (word & ANSTYLEWORD_NOCOLOR1) == 0;
        s.color2 = kPalette[word & 0xF];
        s.color1 = kPalette[(word >> 4) & 0xF];
        return s;
    }
    ANHiliteStyle found{};
    if (ANGetHiliteStyle(doc, word & 0xFFFF, &found) != 1) return s;
    s.color1Set = (found.flags & ANSTYLE_COLOR1) != 0;
    s.color2Set = (found.flags & ANSTYLE_COLOR2) != 0;
    s.attrSet = (found.flags & ANSTYLE_ATTR) != 0;
    s.color1 = found.color1;
    s.color2 = found.color2;
    s.attr1 = found.attr1;
    s.attr2 = found.attr2;
    return s;
}

struct WalkStats {
    int positions = 0;
    int fullCalls = 0;
    int reports = 0;
};

// Starts tracking at `start` and visits `positions` (ascending, none before `start`),
// skipping each with probability `skip`. Every check failure is reported against the
// position; returns the counts so callers can see the walk did work.
inline WalkStats CheckWalk(DAHandle doc, const ANPos &start, const std::vector<ANPos> &positions,
                           std::mt19937 &rng, double skip = 0.0, uint32_t markLeft = 0) {
    WalkStats stats;
    const std::vector<annotest::Listed> list = annotest::ListedEntries(doc);
    std::vector<size_t> listIndex(65536, SIZE_MAX);
    for (size_t i = 0; i < list.size(); ++i) listIndex[list[i].slot] = i;

    ANTrackInfo track;
    std::memset(&track, 0x5A, sizeof track);
    track.markActive = markLeft;
    const uint32_t started = ANStartAnnoTrack(doc, &start, &track);

    // The start, from the head of the list.
    size_t firstNotBefore = list.size();
    for (size_t i = 0; i < list.size(); ++i) {
        if (Cmp(list[i].record.start, start) > 0 || Cmp(list[i].record.end, start) >= 0) {
            firstNotBefore = i;
            break;
        }
    }
    if (list.empty()) {
        EXPECT_EQ(started, ANTRACK_NONE);
        return stats;
    }
    EXPECT_EQ(track.rangeActive, 0u);
    EXPECT_EQ(track.markActive, markLeft);
    EXPECT_EQ(track.color1Set + track.color2Set + track.attrSet, 0u);
    EXPECT_EQ(track.hiliteEntry, AN_NONE);
    if (firstNotBefore == list.size()) {
        EXPECT_EQ(started, ANTRACK_NOMORE);
        EXPECT_EQ(track.cursor, AN_NONE);
        EXPECT_EQ(track.nextChange.itemId, 0xFFFFFFFFu);
        EXPECT_EQ(track.nextChange.subItemId, 0xFFFFFFFFu);
    } else {
        EXPECT_EQ(started, ANTRACK_ACTIVE);
        const annotest::Listed &e = list[firstNotBefore];
        EXPECT_EQ(track.cursor, e.slot);
        const ANPos &expected = Cmp(e.record.start, start) < 0 ? start : e.record.start;
        EXPECT_EQ(Cmp(track.nextChange, expected), 0);
    }

    // The walk. `previous*` describe the last full call (or the start).
    bool previousRange = false;
    bool previousMark = markLeft != 0;
    bool previousHilite = false;
    std::vector<uint16_t> lastCover;  // nothing covers the span before the first change
    std::bernoulli_distribution skipIt(skip);
    for (const ANPos &p : positions) {
        if (Cmp(p, start) < 0 || skipIt(rng)) continue;
        ++stats.positions;
        SCOPED_TRACE(::testing::PrintToString(p));

        std::vector<uint16_t> cover;
        for (const annotest::Listed &e : list) {
            if (Cmp(e.record.start, p) <= 0 && Cmp(p, e.record.end) < 0) cover.push_back(e.slot);
        }
        const ANTrackInfo before = track;
        const bool full = Cmp(p, before.nextChange) >= 0;
        const uint32_t bits = ANTrackAnno(doc, &p, &track);
        if (!full) {
            EXPECT_EQ(bits, 0u);
            EXPECT_EQ(std::memcmp(&before, &track, sizeof track), 0) << "changed before nextChange";
            EXPECT_EQ(cover, lastCover) << "a change went unreported";
            continue;
        }
        ++stats.fullCalls;

        // Expected outputs, by walking the covering entries in list order.
        annotest::CoverReading<annotest::Listed> seed;
        seed.bits = (previousRange ? ANTRACK_BIT_RANGE : 0) |
                    (previousMark ? ANTRACK_BIT_CUTMARK : 0) |
                    (previousHilite ? ANTRACK_BIT_HILITE : 0);
        seed.userData = before.userData;
        if (previousRange && before.cursor != AN_NONE) {
            seed.userData = list[listIndex[before.cursor]].record.userData;
        }
        seed.value = before.value;
        seed.text = before.textBuffer;
        seed.textLength = before.textLength;
        const annotest::CoverReading<annotest::Listed> r =
            annotest::ReadCover(seed, cover, list, listIndex);
        const uint32_t expectBits = r.bits;
        const uint64_t userData = r.userData;
        const uint64_t value = r.value;
        const uint16_t *text = r.text;
        const uint32_t textLength = r.textLength;
        const bool range = r.range;
        const bool mark = r.mark;
        const annotest::Listed *hilite = r.hilite;
        if (bits != 0) ++stats.reports;
        EXPECT_EQ(bits, expectBits);
        EXPECT_EQ(track.rangeActive, range ? 1u : 0u);
        EXPECT_EQ(track.markActive, mark ? 1u : 0u);
        EXPECT_EQ(track.value, value);
        EXPECT_EQ(track.textBuffer, text);
        EXPECT_EQ(track.textLength, textLength);
        EXPECT_EQ(track.userData, userData);
        EXPECT_EQ(track.hiliteEntry, hilite == nullptr ? AN_NONE : hilite->slot);
        if (hilite == nullptr) {
            EXPECT_EQ(track.color1Set + track.color2Set + track.attrSet, 0u);
        } else {
            const ExpectedStyle s = StyleFor(doc, hilite->record.style);
            EXPECT_EQ(track.color1Set, s.color1Set);
            EXPECT_EQ(track.color2Set, s.color2Set);
            EXPECT_EQ(track.attrSet, s.attrSet);
            if (s.color1Set) {
                EXPECT_EQ(track.color1, s.color1);
            }
            if (s.color2Set) {
                EXPECT_EQ(track.color2, s.color2);
            }
            if (s.attrSet) {
                EXPECT_EQ(track.attr1, s.attr1);
                EXPECT_EQ(track.attr2, s.attr2);
            }
        }

        // The cursor stays while its entry runs on past p; otherwise it moves to the
        // next entry not wholly before p. Every entry before it is over by p.
        size_t cursorAt = before.cursor == AN_NONE ? list.size() : listIndex[before.cursor];
        if (cursorAt == list.size() || Cmp(list[cursorAt].record.end, p) <= 0) {
            size_t i = before.cursor == AN_NONE ? 0 : cursorAt + 1;
            while (i < list.size() && Cmp(list[i].record.start, p) <= 0 &&
                   Cmp(list[i].record.end, p) < 0) {
                ++i;
            }
            cursorAt = i;
        }
        EXPECT_EQ(track.cursor, cursorAt == list.size() ? AN_NONE : list[cursorAt].slot);
        for (size_t i = 0; i < std::min(cursorAt, list.size()); ++i) {
            EXPECT_LE(Cmp(list[i].record.end, p), 0) << "slot " << list[i].slot;
        }
        // nextChange: the nearest start or end after p, or p when the cursor ends there.
        const ANPos *nearest = nullptr;
        for (const annotest::Listed &e : list) {
            for (const ANPos *q : {&e.record.start, &e.record.end}) {
                if (Cmp(*q, p) > 0 && (nearest == nullptr || Cmp(*q, *nearest) < 0)) nearest = q;
            }
        }
        if (cursorAt == list.size()) {
            EXPECT_EQ(nearest, nullptr) << "no cursor though an annotation lies ahead";
            EXPECT_EQ(track.nextChange.itemId, 0xFFFFFFFFu);
            EXPECT_EQ(track.nextChange.subItemId, 0xFFFFFFFFu);
        } else {
            const ANAnnoRecord &k = list[cursorAt].record;
            EXPECT_TRUE(Cmp(k.start, p) > 0 || Cmp(k.end, p) >= 0);
            if (Cmp(k.start, p) <= 0 && Cmp(k.end, p) == 0) {
                EXPECT_EQ(Cmp(track.nextChange, p), 0);
            } else if (nearest == nullptr) {
                ADD_FAILURE() << "a cursor though nothing lies ahead";
            } else {
                EXPECT_EQ(Cmp(track.nextChange, *nearest), 0)
                    << "nextChange " << ::testing::PrintToString(track.nextChange) << " expected "
                    << ::testing::PrintToString(*nearest);
            }
        }

        previousRange = range;
        previousMark = mark;
        previousHilite = hilite != nullptr;
        lastCover = cover;
    }
    return stats;
}

}  // namespace tracktest

#endif  // ANNO_TESTS_TRACKING_WALK_CHECK_H
