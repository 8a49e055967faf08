// Brute-force readings of a document's annotation table that the fuzz target holds
// the library's answers against: tracking walks, annotation text reads, events and
// searches. Each one computes from the whole ordered list what the call must give.
#ifndef ANNO_FUZZ_ORACLES_H
#define ANNO_FUZZ_ORACLES_H

#include <cstdint>
#include <vector>

#include "anno/anno.h"
#include "fuzz_support.h"

namespace annofuzz {

// What a tracking walk visited, for the caller's figures.
struct WalkCounts {
    uint32_t positions = 0;
    uint32_t fullCalls = 0;
};

// Starts tracking `doc` at `start` with `markLeft` in markActive and calls
// ANTrackAnno at each of `positions` (ascending, none before `start`). Checks the
// start's state, cursor and nextChange; at every call before nextChange a result of
// 0, an untouched record and the same covering entries as at the last full call; at
// every full call the result bits against the covering entries (0x04, 0x08, 0x20
// exactly; 0x01, 0x10, 0x02 with what covered the last full call's position), the
// record's per-type fields, the highlight in force with its resolved style, the
// cursor and nextChange.
WalkCounts CheckTrackingWalk(DAHandle doc, const ANPos &start, const std::vector<ANPos> &positions,
                             uint32_t markLeft);

// Reads annotation text at each of `positions` through one freshly started text
// track and checks every answer (result, unit, cached range) against the table.
void CheckTextReads(DAHandle doc, const std::vector<ANPos> &positions);

// One notification the callback received.
struct Note {
    uint16_t code;
    uint16_t detail;
    ANAnnoRecord record;  // codes 1 and 2
    ANEventRec event;     // code 3
    uint32_t returned;    // what the callback answered
};

// Checks the deliveries and the result of ANAnnoEvent(doc, event, entry, pos), made
// on a table listed as `list`, with the hover state `hoverEntry`/`hoverPos` before
// the call and `notes` the notifications it caused (`callback` whether one was set).
void CheckEvent(const std::vector<Entry> &list, uint32_t event, uint16_t entry, const ANPos &pos,
                uint16_t hoverEntry, const ANPos &hoverPos, bool callback,
                const std::vector<Note> &notes, uint32_t result);

// The result and out fields ANFindAnno must give for `find` (as passed in) on `doc`,
// which has annotation state. Returns the result code; fills `out` when it is 0.
uint32_t ExpectedFind(DAHandle doc, uint16_t flags, const ANFindRecord &find, ANFindRecord *out,
                      bool *startKnown);

}  // namespace annofuzz

#endif  // ANNO_FUZZ_ORACLES_H
