// Shared by the tests of range annotations: documents laid out item by item, the
// entries a range leaves in the table, and a fixture that hears every notification.
#ifndef ANNO_TESTS_RANGES_RANGE_SUPPORT_H
#define ANNO_TESTS_RANGES_RANGE_SUPPORT_H

#include <gtest/gtest.h>

#include <ostream>
#include <string_view>
#include <vector>

#include "positions/order.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace rangetest {

using annotest::Pos;
using annotest::TextPos;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;

// A document with one item per character of `layout`, item i having id i:
//   '.' type 0, field 2 0      'c' a cut item (type 0, field 2 1)
//   'S' type 240               's' type 241 (both passed over by ranges)
//   'p' type 1                 'q' type 0, field 2 2 (not a cut)
inline DAHandle LaidOut(std::string_view layout) {
    antk::DocumentBuilder builder;
    for (size_t i = 0; i < layout.size(); ++i) {
        uint32_t id = 0;
        switch (layout[i]) {
            case 'c':
                id = builder.cutItem();
                break;
            case 'S':
                id = builder.skippedItem(antk::kItemSkip);
                break;
            case 's':
                id = builder.skippedItem(antk::kItemSkip2);
                break;
            case 'p':
                id = builder.item(antk::kItemParagraph);
                break;
            case 'q':
                id = builder.item(0, 2);
                break;
            default:
                id = builder.item(0, 0);
                break;
        }
        EXPECT_EQ(id, i) << "items are numbered from 0 in one chunk";
    }
    return builder.build();
}

// One entry of the ordered list, as far as range splitting decides it.
struct Stored {
    uint16_t type;
    ANPos start;
    ANPos end;
};

inline bool operator==(const Stored &a, const Stored &b) {
    return a.type == b.type && a.start == b.start && a.end == b.end;
}

inline void PrintTo(const Stored &s, std::ostream *os) {
    *os << "type " << s.type << " [" << ::testing::PrintToString(s.start) << ", "
        << ::testing::PrintToString(s.end) << ")";
}

// A range [a, b) and a cut marker at p, for expectations.
inline Stored Range(const ANPos &a, const ANPos &b) { return Stored{AN_TYPE_RANGE, a, b}; }
inline Stored Range(uint32_t a, uint32_t b) { return Range(Pos(a), Pos(b)); }
inline Stored Mark(const ANPos &p) { return Stored{AN_TYPE_CUTMARK, p, ANStepAfter(p)}; }
inline Stored Mark(uint32_t p) { return Mark(Pos(p)); }

// The entries of the ordered list, first to last.
inline std::vector<Stored> StoredEntries(DAHandle doc) {
    std::vector<Stored> stored;
    for (const annotest::Listed &e : annotest::ListedEntries(doc)) {
        stored.push_back(Stored{e.type, e.record.start, e.record.end});
    }
    return stored;
}

// Adds the range and checks the table afterwards.
#define EXPECT_ADD(code, step)                                    \
    do {                                                          \
        EXPECT_EQ((step), (code)) << #step;                       \
        EXPECT_TRUE(annotest::TableInvariantsHold(doc)) << #step; \
    } while (0)
#define ADD_OK(step) EXPECT_ADD(AN_OK, step)

class RangeTest : public annotest::LeakCheckedTest {
 protected:
    // A laid-out document with annotation state, its callback recorded in `notes`.
    DAHandle NewDoc(std::string_view layout) { return WithState(LaidOut(layout)); }
    DAHandle WithState(DAHandle doc) {
        EXPECT_EQ(ANInit(doc, nullptr, &annotest::Notifications::Callback, &notes), AN_OK);
        return doc;
    }
    // Adds a range and forgets what the callback heard so far.
    uint32_t Prepare(DAHandle doc, const ANPos &a, const ANPos &b) {
        const uint32_t rc = annotest::AddRange(doc, a, b, 9);
        notes.calls.clear();
        return rc;
    }

    annotest::Notifications notes;
};

}  // namespace rangetest

#endif  // ANNO_TESTS_RANGES_RANGE_SUPPORT_H
