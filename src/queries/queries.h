// What the queries share with the rest of the library. ANGetAnnoText, ANAnnoEvent
// and ANFindAnno are exports (declared in the public header) and may be called
// inside the library as they are; the text track's records are in
// tracking/text_track.h.
#ifndef ANNO_QUERIES_QUERIES_H
#define ANNO_QUERIES_QUERIES_H

#include <cstdint>

#include "anno/anno.h"

// Results of ANGetAnnoText for a unit found: its type of annotation text.
constexpr uint32_t ANTEXT_UNIT_FOUND = AN_TYPE_TEXT;                // a unit of type-5 text
constexpr uint32_t ANTEXT_PLACEHOLDER_FOUND = AN_TYPE_PLACEHOLDER;  // a type-6 unit

#endif  // ANNO_QUERIES_QUERIES_H
