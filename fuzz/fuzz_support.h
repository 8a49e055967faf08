// What the fuzz target's parts share: the input reader, the count of library calls, failure
// reports, the table view, and the brute-force readings the answers are held against.
#ifndef ANNO_FUZZ_SUPPORT_H
#define ANNO_FUZZ_SUPPORT_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "anno/anno.h"
#include "support/table_view.h"

namespace annofuzz {

// Reads choices from the input; past its end every read gives 0, so any input,
// however short, decodes into something.
class Input {
 public:
    Input(const uint8_t *data, size_t size) : data_(data), size_(size) {}
    bool done() const { return pos_ >= size_; }
    uint8_t byte() { return pos_ < size_ ? data_[pos_++] : 0; }
    uint32_t u16() { return byte() | static_cast<uint32_t>(byte()) << 8; }
    uint32_t u32() { return u16() | u16() << 16; }
    // A value below n (n > 0): one byte for small n, more for large ones.
    uint32_t below(uint32_t n) {
        if (n <= 1) return 0;
        if (n <= 256) return byte() % n;
        return n <= 65536 ? u16() % n : u32() % n;
    }
    bool chance(uint32_t k) { return byte() < k; }  // true with probability about k/256

 private:
    const uint8_t *data_;
    size_t size_, pos_ = 0;
};

// Library calls made by the target so far, over all inputs: CALL(ANAddAnno(doc, type, desc)).
extern uint64_t apiCalls;
#define CALL(expr) (++::annofuzz::apiCalls, (expr))

// What the current operation is, for failure reports.
void SetContext(const std::string &what);
// Reports a broken expectation with the context and the input's operations so far,
// then aborts (a finding for the fuzzer, a failed test for the replay).
[[noreturn]] void Fail(const std::string &what);
#define CHECK(cond, what) ((cond) ? (void)0 : ::annofuzz::Fail(std::string(#cond) + ": " + (what)))

inline std::string N(uint64_t v) { return std::to_string(v); }
inline int Cmp(const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b); }
inline bool SameAnchor(const ANPos &a, const ANPos &b) {
    return a.itemId == b.itemId && a.subItemId == b.subItemId;
}
inline bool Same(const ANPos &a, const ANPos &b) {
    return SameAnchor(a, b) && a.kind == b.kind && a.textIndex == b.textIndex;
}
std::string Text(const ANPos &pos);

// The one view of the table (tests/support/table_view.h).
using annotest::AnchorText;
using annotest::Entry;
using annotest::HasTable;
using annotest::ListEntries;
using annotest::TableBytes;

// Index of each slot in a listing, -1 for slots not listed.
struct SlotIndex {
    explicit SlotIndex(const std::vector<Entry> &list);
    int operator[](uint16_t slot) const { return slot < at.size() ? at[slot] : -1; }
    std::vector<int> at;
};
// Whether two listings are the same entries, records and texts (text buffers aside).
bool SameListing(const std::vector<Entry> &a, const std::vector<Entry> &b);

// How the runs of one process decode their inputs (the fuzzer keeps the defaults).
struct Settings {
    // Entries added to the first document before the operations, so that its table is
    // large enough for the lookup index of every build.
    uint32_t fillers = 0;
    bool sweep = false;  // every operation runs as if a failure were armed (sweeps arm their own)
    std::function<void()> arm;     // once the documents are made and bound, before the first op
    std::function<void()> disarm;  // when the operations are over, before the state is released
};
extern Settings settings;

// Decodes and runs one input; aborts with a report on the first broken expectation.
void RunInput(const uint8_t *data, size_t size);

// ---- Brute-force readings of a table (oracles.cpp): each computes from the whole ordered
// list what the call must give.

// Starts tracking `doc` at `start` (markActive = `markLeft`) and calls ANTrackAnno at each
// of `positions` (ascending, none before `start`). Checks the start's state, cursor and
// nextChange; before nextChange a result of 0, an untouched record and unchanged covering
// entries; at every full call the bits against the covering entries (0x01, 0x10, 0x02 with
// what covered the last full call), the per-type fields, the highlight in force with its
// resolved style, the cursor and nextChange.
void CheckTrackingWalk(DAHandle doc, const ANPos &start, const std::vector<ANPos> &positions,
                       uint32_t markLeft);

// Reads annotation text at each of `positions` through one fresh text track and checks
// every answer (result, unit, cached range) against the table; with `faulty` (a failure
// armed) the first failure's code ends the reads.
void CheckTextReads(DAHandle doc, const std::vector<ANPos> &positions, bool faulty);

struct Note {  // one notification the callback received
    uint16_t code, detail;
    ANAnnoRecord record;  // codes 1 and 2
    ANEventRec event;     // code 3
    uint32_t returned;    // what the callback answered
};

// Checks the deliveries `notes` and the result of ANAnnoEvent(doc, event, entry, pos) on a
// table listed as `list`, with the hover state before the call (`callback`: one was set).
void CheckEvent(const std::vector<Entry> &list, uint32_t event, uint16_t entry, const ANPos &pos,
                uint16_t hoverEntry, const ANPos &hoverPos, bool callback,
                const std::vector<Note> &notes, uint32_t result);

// The result ANFindAnno must give for `find` on `doc` (with annotation state); fills `out`
// when it is 0, and clears `startKnown` when stepping could not count the anchor's units.
uint32_t ExpectedFind(DAHandle doc, uint16_t flags, const ANFindRecord &find, ANFindRecord *out,
                      bool *startKnown);

}  // namespace annofuzz

#endif  // ANNO_FUZZ_SUPPORT_H
