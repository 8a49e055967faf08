// What the hostile-input tests share: an annotated document, one without annotation
// state, a snapshot of everything a call could change, the positions to throw at the
// library, caller records of exactly the size they claim, and the count of inputs.
#ifndef ANNO_TESTS_HOSTILE_HOSTILE_SUPPORT_H
#define ANNO_TESTS_HOSTILE_HOSTILE_SUPPORT_H

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "anno/anno.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace hostile {

// Items of the annotated document: 0 to 9 plain, 10 a text item of 7 characters (ids
// 0 to 6), 11 a cut item, 12 a skipped item, 13 to 15 plain.
constexpr uint32_t kTextItem = 10;
constexpr uint32_t kLastItem = 15;
constexpr uint32_t kTextAnchorItem = 6;  // carries annotation text "ab", a placeholder, "cd"

// Counts one input tried and gives its result back.
uint32_t Tried(uint32_t rc);
uint64_t InputsTried();

// Everything of a document's annotation state that a call may change, copied.
struct Snapshot {
    bool hasState = false;
    std::vector<annotest::Listed> entries;
    std::vector<uint8_t> header;  // the table header, when there is a table
    uint16_t hoverEntry = 0;
    ANPos hoverPos{};
    uint32_t buildCursor = 0;
    ANCallback callback = nullptr;
    void *callbackData = nullptr;
    std::vector<ANHiliteStyle> styles;
    std::vector<ANHiliteStyle> globalStyles;

    static Snapshot Of(DAHandle doc);
};
bool operator==(const Snapshot &a, const Snapshot &b);
// The styles of a table, in order.
std::vector<ANHiliteStyle> StylesOf(const ANStyleTable *table);

// Positions inside and beyond the document, on items and characters, with every kind
// (0 to 6 and 0xFFFFFFFF) and text indices at both ends.
std::vector<ANPos> HostilePositions();
// A smaller set with every kind, for calls that change the table.
std::vector<ANPos> FewHostilePositions();
// Every kind a position may carry here.
const std::vector<uint32_t> &Kinds();

// A caller record of exactly `size` bytes (at least the 4 of its size field), the
// rest taken from `model`, so that reading past the size it claims is caught.
class SizedRecord {
 public:
    SizedRecord(uint32_t size, const void *model, size_t modelBytes);
    void *get() { return bytes_.get(); }
    const std::vector<uint8_t> &original() const { return original_; }
    bool unchanged() const;

 private:
    std::unique_ptr<uint8_t[]> bytes_;
    std::vector<uint8_t> original_;
};

// An annotated document, one without annotation state, one whose module data has no
// chunker, and a global style table; all released before the leak check.
class HostileTest : public annotest::LeakCheckedTest {
 protected:
    void SetUp() override;
    void TearDown() override;

    // Adds the annotations every test starts from.
    static void Annotate(DAHandle doc);

    DAHandle doc_ = nullptr;
    DAHandle bare_ = nullptr;       // no annotation state
    DAHandle noChunker_ = nullptr;  // ANInit makes nothing for it
    ANStyleTable *global_ = nullptr;
    annotest::Notifications notes_;
};

// The annotated document (items as above), without annotation state.
DAHandle HostileDocument();

}  // namespace hostile

#endif  // ANNO_TESTS_HOSTILE_HOSTILE_SUPPORT_H
