// What the trimming and the cutting of a range annotation share: the step of their
// walks, the tests that tell positions apart, and the cutting walk itself.
#ifndef ANNO_RANGES_WALK_H
#define ANNO_RANGES_WALK_H

#include <cstdint>

#include "anno/anno.h"
#include "binding/instance.h"

// Moves `pos` to the next position of the merged walk of content and annotation text.
// False when there is none (the document's end, a position outside it, a chunker
// failure): `pos` is then unchanged, and the walk that asked ends there rather than
// asking again.
bool ANStepRangePos(DAHandle doc, ANPos *pos);

// Whether the chunker item under `pos` (for annotation text, its anchor's item) is
// one that ranges pass over (types 240 and 241). An item the chunker cannot give is
// not skipped.
bool ANIsSkippedPos(const ANInstance *instance, const ANPos &pos);

// Neither skipped nor covered by a range or a cut marker.
bool ANIsGoodPos(const ANInstance *instance, const ANPos &pos);

// Cuts the trimmed range held in `entry` (start before end) at its cut positions:
// adds the pieces and markers and leaves the last piece in `entry` with *insertLast
// 1, or *insertLast 0 when nothing is left. Results as ANSplitRangeAnno's 13 and
// ANAddRecord failures; 0 otherwise.
uint32_t ANCutRangeAnno(DAHandle doc, ANInstance *instance, ANAnnoRecord *entry,
                        uint32_t *insertLast, uint16_t entryFlags);

#endif  // ANNO_RANGES_WALK_H
