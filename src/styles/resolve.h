// Turning the style word of a highlight into the style output of a tracking record.
#ifndef ANNO_STYLES_RESOLVE_H
#define ANNO_STYLES_RESOLVE_H

#include <cstdint>

#include "anno/anno.h"

struct ANEntryTable;

// The fixed colours a direct style word indexes, as 0x00BBGGRR.
inline constexpr uint32_t ANPalette16[16] = {
    0x000000,  // black
    0x000080,  // dark red
    0x008000,  // dark green
    0x008080,  // dark yellow
    0x800000,  // dark blue
    0x800080,  // dark magenta
    0x808000,  // dark cyan
    0xC0C0C0,  // light grey
    0x808080,  // dark grey
    0x0000FF,  // red
    0x00FF00,  // green
    0x00FFFF,  // yellow
    0xFF0000,  // blue
    0xFF00FF,  // magenta
    0xFFFF00,  // cyan
    0xFFFFFF,  // white
};

// Direct style word: palette index of color2 in bits 0-3, of color1 in bits 4-7.
constexpr uint32_t ANSTYLEWORD_COLOR2_SHIFT = 0;
constexpr uint32_t ANSTYLEWORD_COLOR1_SHIFT = 4;
constexpr uint32_t ANSTYLEWORD_INDEX_MASK = 0xF;
// Style-number word: the style id in bits 0-15.
constexpr uint32_t ANSTYLEWORD_ID_MASK = 0xFFFF;

// Resolves the style word of the type-1 entry `entry` of `table` into `track`:
// a direct word picks palette colours, a style number is looked up in the document's
// own table, then in its global table. Sets track->userData to the entry's userData.
// Expects the three flags of `track` already 0; writes only the outputs the word or
// style gives. A style that cannot be found leaves the flags 0. Always returns the
// tracking bit 0x02.
uint32_t ANResolveStyle(DAHandle doc, const ANEntryTable *table, ANTrackInfo *track,
                        uint16_t entry);

#endif  // ANNO_STYLES_RESOLVE_H
