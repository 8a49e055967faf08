// The rules of an annotation table as plain checks, without a test framework, so that
// the GoogleTest suites and the fuzzer share one reading of them.
#ifndef ANNO_TESTS_TABLE_RULES_H
#define ANNO_TESTS_TABLE_RULES_H

#include <string>

#include "anno/anno.h"
#include "store/table.h"

namespace annotest {

// The table rules every operation keeps: both lists consistent (prev mirrors next,
// ends are AN_NONE, first/last/freeFirst/freeLast agree) and together covering every
// slot once; count is the ordered list's length; at least one free slot; capacity a
// step of 10 up to 65530; `full` only with one free slot left; every entry has a
// type 1..7 and start at or before end; starts never decrease along the ordered
// list; hasText set when a text entry is present; every type-5 entry owns a buffer
// whose capacity is a multiple of 64 above its length and keeps no caller text.
// Returns an empty string when they hold (a null table holds them), otherwise what
// is broken.
std::string TableRulesBroken(const ANEntryTable *table);

// The table rules of the document's table, and the document's hover state naming
// either no entry or an entry of the ordered list. Empty for a document without
// annotation state.
std::string DocumentRulesBroken(DAHandle doc);

// A position as text: (item, sub or -, kind, index).
std::string PosText(const ANPos &pos);

}  // namespace annotest

#endif  // ANNO_TESTS_TABLE_RULES_H
