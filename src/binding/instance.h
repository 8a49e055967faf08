// The annotation state of one document, its lookup from a document handle, and the
// notification callback.
#ifndef ANNO_BINDING_INSTANCE_H
#define ANNO_BINDING_INSTANCE_H

#include <cstdint>

#include "anno/anno.h"
#include "hosts/modules.h"

struct ANEntryTable;
struct ANEntryIndex;

// One cached character map of position mapping: for every character of `chunk`, the
// index of the item holding it, in a movable global-memory block.
struct ANCharMap {
    uint16_t chunk;   // AN_NONE when the record is empty
    void *block;      // HGLOBAL of u32 item indices, or null
    uint32_t length;  // characters recorded in block
    uint32_t base;    // ordinal of the chunk's first character
};

constexpr uint16_t ANMAP_NO_CHUNK = 0xFFFF;

// The annotation state of a document, kept in slot 151 of its module data.
struct ANInstance {
    CHHandle chunker;
    ANEntryTable *entries;       // null until the first insertion
    ANEntryIndex *index;         // lookup index of a large table (store/index.h), or null
    ANStyleTable *styles;        // per-document styles; null if it could not be made
    ANStyleTable *globalStyles;  // the caller's, bound at ANInit
    uint16_t hoverEntry;         // slot of the last move event, AN_NONE for none
    ANPos hoverPos;              // position of the last move event
    ANCallback callback;
    void *callbackData;
    uint32_t buildCursor;    // next document range ANBuildAnnos examines
    uint32_t charSet;        // character set content is read in
    ANCharMap mapCache[2];   // most recently used first
    DAHandle contentDoc;     // second document opened for content reading
    CAHandle content;        // content handle on contentDoc
    uint32_t contentFailed;  // bit 0: opening the content failed once
    // Blocks callers handed over (userData of types 1, 3, 5) whose annotations merged
    // into others or went unannounced; ANClearUserData frees them with the entries'.
    uint64_t *orphans;
    uint32_t orphanCount, orphanCapacity;
};

constexpr uint32_t ANCONTENT_FAILED = 0x1;

// Finds the annotation state of `doc`: 15 for a null handle, a DAGetAnno failure
// unchanged, 18 when the document has none; 0 and *instance otherwise.
uint32_t ANFindState(DAHandle doc, ANInstance **instance);

// Calls the document's callback when one is set; returns its result, or 0.
uint32_t ANNotify(const ANInstance *instance, uint16_t code, uint16_t detail, void *record);

// Resets the hover state of the last move event to "none".
void ANResetHover(ANInstance *instance);

#endif  // ANNO_BINDING_INSTANCE_H
