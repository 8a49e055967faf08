// Range splitting: fitting a type-3 annotation to the document's structure before
// it is stored.
#ifndef ANNO_RANGES_SPLIT_H
#define ANNO_RANGES_SPLIT_H

#include <cstdint>

#include "anno/anno.h"

// Fits the type-3 annotation `record` (start at or before end) to the document and
// cuts it into pieces, which it adds itself; `entry` receives the first 64 bytes of
// `record` (its other fields are kept) and then the extent of the last piece.
// Sets *insertLast to 1 when `entry` holds a last piece that ANAddRecord is to
// insert, 0 when nothing more is to be inserted. `entryFlags` goes to every piece.
// Returns 15 (null doc), a DAGetAnno failure, 18 (no state) — *insertLast and
// `entry` untouched in these three cases — or a failure of adding a piece (pieces
// added before it stay), otherwise 0.
uint32_t ANSplitRangeAnno(DAHandle doc, const ANAnnoRecord *record, ANAnnoRecord *entry,
                          uint32_t *insertLast, uint16_t entryFlags);

#endif  // ANNO_RANGES_SPLIT_H
