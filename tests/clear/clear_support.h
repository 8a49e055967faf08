// What the clearing tests share beyond the store's test helpers: finding entries by
// tag, and a callback that records how each removal looked from inside the call.
#ifndef ANNO_TESTS_CLEAR_SUPPORT_H
#define ANNO_TESTS_CLEAR_SUPPORT_H

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

#include "binding/instance.h"
#include "store/table.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace cleartest {

inline ANInstance *StateOf(DAHandle doc) { return static_cast<ANInstance *>(antk::annoSlot(doc)); }
// The table, writable, for tests that stage a state adding cannot reach.
inline ANEntryTable *MutableTable(DAHandle doc) { return StateOf(doc)->entries; }

// The entry tagged `tag`; null when none is.
inline const annotest::Listed *Tagged(const std::vector<annotest::Listed> &list, uint32_t tag) {
    for (const annotest::Listed &entry : list) {
        if (entry.record.tag == tag) return &entry;
    }
    return nullptr;
}

// Tags in list order.
inline std::vector<uint32_t> Tags(DAHandle doc) {
    std::vector<uint32_t> tags;
    for (const annotest::Listed &entry : annotest::ListedEntries(doc)) {
        tags.push_back(entry.record.tag);
    }
    return tags;
}

// One call of the callback as the callback saw it.
struct Removal {
    uint16_t code;
    uint16_t type;
    ANAnnoRecord record;
    uint16_t countAtCall;  // entries in the table during the call
    bool slotFree;         // the record's slot was already on the free list
    std::u16string anchorText;
};

// Records notifications and answers each with the next of `results` (the last one
// repeating; 0 when empty).
struct Recorder {
    DAHandle doc = nullptr;
    ANPos anchor{};
    std::vector<uint32_t> results;
    std::vector<Removal> calls;

    static uint32_t Callback(uint16_t code, uint16_t detail, void *record, void *data) {
        auto *self = static_cast<Recorder *>(data);
        Removal seen{code, detail, *static_cast<const ANAnnoRecord *>(record), 0, false, {}};
        const ANEntryTable *table = annotest::TableOf(self->doc);
        if (table != nullptr) {
            seen.countAtCall = table->count;
            for (uint16_t i = table->freeFirst; i != AN_NONE; i = ANSlot(table, i).next) {
                if (&ANSlot(table, i).record == record) seen.slotFree = true;
            }
        }
        seen.anchorText = annotest::AnchorText(self->doc, self->anchor);
        const size_t n = self->calls.size();
        self->calls.push_back(seen);
        if (self->results.empty()) return 0;
        return n < self->results.size() ? self->results[n] : self->results.back();
    }

    void Listen(DAHandle target) {
        doc = target;
        ASSERT_EQ(ANSetCallback(target, &Recorder::Callback, this), AN_OK);
    }
    std::vector<uint32_t> RemovedTags() const {
        std::vector<uint32_t> tags;
        for (const Removal &call : calls) tags.push_back(call.record.tag);
        return tags;
    }
};

// The checks every clear must leave true: the table's rules and the layout of
// annotation text.
inline ::testing::AssertionResult StoreHolds(DAHandle doc) {
    ::testing::AssertionResult table = annotest::TableInvariantsHold(doc);
    if (!table) return table;
    return annotest::TextLayoutHolds(doc);
}

}  // namespace cleartest

#endif  // ANNO_TESTS_CLEAR_SUPPORT_H
