// The one place where tests look inside a document's annotation table: its rules, and a
// plain listing of the ordered list for the brute-force readings. Only this file follows a
// redesign of the insides. Framework-free: the GoogleTest suites and the fuzz target share it.
#ifndef ANNO_TESTS_TABLE_VIEW_H
#define ANNO_TESTS_TABLE_VIEW_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "anno/anno.h"

namespace annotest {

struct Entry {  // one entry of the ordered list; `slot` is its number in tracking and events
    uint16_t slot;
    uint16_t type;
    bool ownsUserData;  // userData is a caller's heap block that ANClearUserData frees
    ANAnnoRecord record;
    std::u16string text;  // type 5: its units
};

std::vector<Entry> ListEntries(DAHandle doc);    // first to last; empty without a table
bool HasTable(DAHandle doc);                     // a clear that empties the table frees it
std::vector<uint8_t> TableBytes(DAHandle doc);   // what read-only calls must keep
uint16_t HoverEntry(DAHandle doc, ANPos *pos);   // the last move event's entry and position
uint32_t BuildCursor(DAHandle doc);              // the next range ANBuildAnnos examines
std::vector<uint64_t> KeptBlocks(DAHandle doc);  // held for ANClearUserData, of no entry

// The rules every operation keeps: both lists of the table consistent and together
// covering every slot once; count the ordered list's length; at least one free slot;
// capacity a step of 10 up to 65530; `full` only with one free slot left; every entry
// has a type 1..7 and start at or before end; starts never decrease along the list;
// hasText set when a text entry is present; every type-5 entry owns a buffer longer
// than its text and keeps no caller text; the hover entry, if any, is listed. Empty
// when they hold (also without state or table), otherwise what is broken.
std::string DocumentRulesBroken(DAHandle doc);

// Annotation text at the plain anchor of `anchor`: the units of the type-5 and type-6
// entries there in list order, a placeholder read as `placeholder`.
std::u16string AnchorText(const std::vector<Entry> &list, const ANPos &anchor,
                          char16_t placeholder = u'\xFFFF');

// Live blocks the library and NewHeapBlock took from the process heap and global memory:
// the platform layer's counters, or on Windows counting wrappers in anno.dll's imports.
int64_t HeapBlocks();
int64_t GlobalBlocks();

// A caller block from the process heap, as userData of types 1, 3 and 5 may be.
uint64_t NewHeapBlock(size_t bytes);
void FreeHeapBlock(uint64_t block);
std::string PosText(const ANPos &pos);  // (item, sub or -, kind, index)
struct ContentPiece {  // a content read's fields, room and buffer as handed: edit them to lie
    uint32_t &type, &flags, &room, &charCount, &charSet, &written;
    unsigned char *buffer;
};
void HookContentReads(const std::function<void(ContentPiece &)> &edit);  // empty: unhooks

}  // namespace annotest

#endif  // ANNO_TESTS_TABLE_VIEW_H
