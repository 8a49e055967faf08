// The scenarios the failure sweeps run, and the steps they are made of. Together the
// scenarios reach every allocation the library makes and every kind of module call.
#ifndef ANNO_TESTS_SWEEPS_SCENARIOS_H
#define ANNO_TESTS_SWEEPS_SCENARIOS_H

#include <string>
#include <vector>

#include "sweeps/sweep.h"

namespace sweep {

// What each call may give in a sweep (see Step::codes).
extern const Codes kInitCodes;
extern const Codes kDeInitCodes;
extern const Codes kAddCodes;
extern const Codes kClearCodes;
extern const Codes kClearUserDataCodes;
extern const Codes kCopyCodes;
extern const Codes kBuildCodes;
extern const Codes kStyleTableCodes;
extern const Codes kGlobalStyleAddCodes;
extern const Codes kDocStyleAddCodes;
extern const Codes kTextTrackStartCodes;
extern const Codes kGetTextCodes;
extern const Codes kMapCodes;
extern const Codes kFindCodes;
extern const Codes kNextChunkerCodes;

// ---- Steps ---------------------------------------------------------------------------
// Documents are named by their index in World::docs; caller blocks by their index in
// World::blocks (-1 for none).

Step InitGlobalStyles();
Step DeInitGlobalStyles();
Step AddGlobalStyle(uint32_t id, bool olderForm = false);
Step InitDoc(size_t doc);
Step DeInitDoc(size_t doc);
Step AddDocStyle(size_t doc, uint32_t id, bool olderForm = false);
Step GetDocStyle(size_t doc, uint32_t id);

Step AddHilite(size_t doc, ANPos start, ANPos end, uint32_t tag, uint32_t style = 0, int block = -1,
               uint32_t form = 72);
Step AddPoint(size_t doc, ANPos pos, uint32_t tag, uint16_t type = AN_TYPE_POINT,
              uint32_t form = 72);
Step AddRange(size_t doc, ANPos start, ANPos end, uint32_t tag, int block = -1, uint32_t form = 48);
Step AddText(size_t doc, ANPos pos, std::u16string text, uint32_t tag, int block = -1);
Step AddUnit(size_t doc, ANPos pos, uint32_t tag, uint16_t type = AN_TYPE_PLACEHOLDER,
             uint32_t form = 32);

Step Clear(size_t doc, uint16_t flags, uint32_t value);
// ANClearUserData; the blocks it freed are noted in World::freedBlocks.
Step ClearUserData(size_t doc);

Step StartTextTrack(size_t track);
Step EndTextTrack(size_t track);
Step GetText(size_t doc, size_t track, ANPos pos);

Step MapOrdinal(size_t doc, uint32_t ordinal);
Step MapPos(size_t doc, ANPos pos);

Step Find(size_t doc, uint16_t mode, uint32_t tag, ANPos key = ANPos{}, uint16_t flags = 0);
Step Event(size_t doc, uint32_t event, uint16_t entry, ANPos pos);
Step NextChunkerPos(size_t doc, ANPos pos);
Step NextAnnoTextPos(size_t doc, ANPos pos);
Step NextPos(size_t doc, ANPos pos);
// Switches the document's callback off, or back to World::notes.
Step SetCallback(size_t doc, bool on);

Step Copy(size_t dest, size_t src);
Step Build(size_t doc);

// Walks the document from `from` with ANNextPos to its end, tracking with record
// `track` and reading annotation text with text track `text` at every text position;
// checks each call's result and that the walk moves forward and ends. Gives the
// number of positions visited.
Step Walk(size_t doc, ANPos from, size_t track, size_t text);

// ---- Scenarios -----------------------------------------------------------------------

// Global and per-document styles growing past 10, every annotation type in every
// descriptor form, the table growing past 10 and 20 entries, tracking, finding,
// events, clearing by tag and userData.
Scenario StylesAndAnnotations();
// Annotation text: new, appended and inserted texts growing their buffers, a
// placeholder splitting a text, six segments at one anchor, text tracks, walks, and
// clears that join texts.
Scenario AnnotationText();
// Position mapping over three chunks of two documents (one read wide): maps made,
// swapped and evicted.
Scenario Mapping();

// Range annotations fitted to a document with cut items, skipped items, placeholders
// in annotation text and an existing cut marker: pieces, markers, merges.
Scenario RangeSplitting();
// Copying annotations and styles into an empty and into an annotated document, and
// building highlights from a document's own ranges, twice.
Scenario CopyingAndBuilding();

// A table past the size from which it keeps a lookup index: text steps, text shifts
// and range coverage found through the index, which is made, extended and dropped.
// Run by the out-of-memory sweep only (its walks would make the module sweep long).
constexpr uint32_t kLargeTableItems = 300;
Scenario LargeTable();

std::vector<Scenario> AllScenarios();

}  // namespace sweep

#endif  // ANNO_TESTS_SWEEPS_SCENARIOS_H
