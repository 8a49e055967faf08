// Range splitting: fitting a type-3 annotation to the document's structure before
// it is stored, and cutting it into pieces with cut markers.
#ifndef ANNO_RANGES_SPLIT_H
#define ANNO_RANGES_SPLIT_H

#include <cstdint>

#include "anno/anno.h"
#include "binding/instance.h"

// Fits the type-3 annotation `record` (start at or before end) to the document and
// cuts it into pieces. `entry` receives the first 64 bytes of `record` (its other
// fields are kept), then the trimmed extent of the last piece. Pieces before each cut
// are added through ANAddRecord (quiet, with `entryFlags`), and a cut marker (type 7,
// no entry flags) at each cut position that has none. Sets *insertLast to 1 when
// `entry` holds a last piece that ANAddRecord is to insert, 0 when nothing more is to
// be inserted; ANAddRecord sends the one notification.
// Returns 15 (null doc), a DAGetAnno failure, 18 (no state) — *insertLast and `entry`
// untouched in these three cases —, 13 when the text track cannot be started (nothing
// added), or ANAddRecord's failure for a piece or a marker (those added before it
// stay, *insertLast 0); otherwise 0.
uint32_t ANSplitRangeAnno(DAHandle doc, const ANAnnoRecord *record, ANAnnoRecord *entry,
                          uint32_t *insertLast, uint16_t entryFlags);

// 1 when a type-3 entry or a cut marker (type 7) covers `pos` (start <= pos < end),
// else 0; a null instance, a missing table or an empty list counts as not covered.
uint32_t ANPosInRangeOrMark(const ANInstance *instance, const ANPos *pos);

// 1 when a type-3 entry covers `pos`, else 0; as ANPosInRangeOrMark otherwise.
uint32_t ANPosInRange(const ANInstance *instance, const ANPos *pos);

#endif  // ANNO_RANGES_SPLIT_H
