// What the copying and building tests read back from a document beyond the shared
// helpers: its state, its table's bytes, and entries compared as annotations.
#ifndef ANNO_TESTS_COPYBUILD_ENTRIES_H
#define ANNO_TESTS_COPYBUILD_ENTRIES_H

#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "binding/instance.h"
#include "store/table.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace copybuild {

inline ANInstance *StateOf(DAHandle doc) { return static_cast<ANInstance *>(antk::annoSlot(doc)); }

// The table block byte for byte, slots and buffer addresses included: equal bytes
// mean nothing at all changed.
inline std::string TableBytes(DAHandle doc) {
    const ANEntryTable *table = annotest::TableOf(doc);
    if (table == nullptr) return {};
    return std::string(reinterpret_cast<const char *>(table), ANTableBytes(table->capacity));
}

// Two entries hold the same annotation: type, record fields and text, wherever the
// library keeps them (slot, flags, buffer and its capacity aside).
inline ::testing::AssertionResult SameAnnotation(const annotest::Listed &a,
                                                 const annotest::Listed &b) {
    const ANAnnoRecord &x = a.record;
    const ANAnnoRecord &y = b.record;
    const bool text = a.type == AN_TYPE_TEXT;
    if (a.type == b.type && x.size == y.size && x.tag == y.tag && x.start == y.start &&
        x.end == y.end && x.eventMask == y.eventMask && x.userData == y.userData &&
        x.value == y.value && (text || x.value64 == y.value64) &&
        (!text || x.textLength == y.textLength) && a.text == b.text) {
        return ::testing::AssertionSuccess();
    }
    return ::testing::AssertionFailure()
           << "type " << a.type << " tag 0x" << std::hex << x.tag << " vs type " << std::dec
           << b.type << " tag 0x" << std::hex << y.tag << std::dec << ", "
           << ::testing::PrintToString(x.start) << ".." << ::testing::PrintToString(x.end) << " vs "
           << ::testing::PrintToString(y.start) << ".." << ::testing::PrintToString(y.end);
}

}  // namespace copybuild

#endif  // ANNO_TESTS_COPYBUILD_ENTRIES_H
