// What the copying and building tests read back from a document: its entries in
// list order, as plain values that compare and print.
#ifndef ANNO_TESTS_COPYBUILD_ENTRIES_H
#define ANNO_TESTS_COPYBUILD_ENTRIES_H

#include <gtest/gtest.h>

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

#include "binding/instance.h"
#include "store/table.h"
#include "support/fixture.h"

namespace copybuild {

// One entry as a caller would describe it: no slot numbers, no buffer addresses.
struct EntryView {
    uint16_t type = 0;
    uint16_t flags = 0;
    uint32_t size = 0;
    uint32_t tag = 0;
    ANPos start{};
    ANPos end{};
    uint32_t eventMask = 0;
    uint64_t userData = 0;
    uint64_t value = 0;
    uint64_t word64 = 0;  // style, or type 2's carried value
    std::u16string text;  // type 5

    // The annotation itself, without the library's bookkeeping flags.
    bool sameAnnotation(const EntryView &o) const {
        return type == o.type && size == o.size && tag == o.tag && start == o.start &&
               end == o.end && eventMask == o.eventMask && userData == o.userData &&
               value == o.value && word64 == o.word64 && text == o.text;
    }
};

inline void PrintTo(const EntryView &e, std::ostream *os) {
    *os << "{type " << e.type << ", tag 0x" << std::hex << e.tag << std::dec << ", ";
    ::PrintTo(e.start, os);
    *os << "..";
    ::PrintTo(e.end, os);
    *os << ", userData " << e.userData << ", text " << e.text.size() << " units}";
}

inline ANInstance *StateOf(DAHandle doc) { return static_cast<ANInstance *>(antk::annoSlot(doc)); }

inline std::vector<EntryView> Entries(DAHandle doc) {
    std::vector<EntryView> out;
    const ANInstance *state = StateOf(doc);
    if (state == nullptr || state->entries == nullptr) return out;
    const ANEntryTable *table = state->entries;
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        const ANAnnoRecord &r = entry.record;
        EntryView v;
        v.type = entry.type;
        v.flags = entry.flags;
        v.size = r.size;
        v.tag = r.tag;
        v.start = r.start;
        v.end = r.end;
        v.eventMask = r.eventMask;
        v.userData = r.userData;
        v.value = r.value;
        if (entry.type == AN_TYPE_TEXT) {
            if (r.textBuffer != nullptr) v.text.assign(r.textBuffer, r.textBuffer + r.textLength);
        } else {
            v.word64 = r.value64;
        }
        out.push_back(v);
    }
    return out;
}

// The text buffers of a document's type-5 entries, in list order.
inline std::vector<const uint16_t *> TextBuffers(DAHandle doc) {
    std::vector<const uint16_t *> out;
    const ANInstance *state = StateOf(doc);
    if (state == nullptr || state->entries == nullptr) return out;
    const ANEntryTable *table = state->entries;
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        if (ANSlot(table, i).type == AN_TYPE_TEXT)
            out.push_back(ANSlot(table, i).record.textBuffer);
    }
    return out;
}

// Raw slots of a table, byte for byte, to show that nothing at all changed.
inline std::string TableBytes(DAHandle doc) {
    const ANInstance *state = StateOf(doc);
    if (state == nullptr || state->entries == nullptr) return {};
    const auto *bytes = reinterpret_cast<const char *>(state->entries);
    return std::string(bytes, ANTableBytes(state->entries->capacity));
}

}  // namespace copybuild

#endif  // ANNO_TESTS_COPYBUILD_ENTRIES_H
