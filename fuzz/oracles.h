// Brute-force readings of a document's annotation table that the fuzz target holds
// the library's answers against: each one computes from the whole ordered list what
// the call must give.
#ifndef ANNO_FUZZ_ORACLES_H
#define ANNO_FUZZ_ORACLES_H

#include "fuzz_support.h"

namespace annofuzz {

// Starts tracking `doc` at `start` (markActive = `markLeft`) and calls ANTrackAnno at each
// of `positions` (ascending, none before `start`). Checks the start's state, cursor and
// nextChange; before nextChange a result of 0, an untouched record and unchanged covering
// entries; at every full call the bits against the covering entries (0x01, 0x10, 0x02 with
// what covered the last full call), the per-type fields, the highlight in force with its
// resolved style, the cursor and nextChange.
void CheckTrackingWalk(DAHandle doc, const ANPos &start, const std::vector<ANPos> &positions,
                       uint32_t markLeft);

// Reads annotation text at each of `positions` through one fresh text track and checks
// every answer (result, unit, cached range) against the table.
void CheckTextReads(DAHandle doc, const std::vector<ANPos> &positions);

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

#endif  // ANNO_FUZZ_ORACLES_H
