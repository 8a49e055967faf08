// Adding annotations of every type in tests, and recording what the callback hears.
#ifndef ANNO_TESTS_ADD_HELPERS_H
#define ANNO_TESTS_ADD_HELPERS_H

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "anno/anno.h"

namespace annotest {

// Each adds one annotation through ANAddAnno in the type's largest descriptor form
// and returns ANAddAnno's result.
uint32_t AddHilite(DAHandle doc, const ANPos &start, const ANPos &end, uint32_t tag = 1,
                   uint32_t style = 0, uint64_t userData = 0, uint32_t eventMask = 0,
                   uint64_t value = 0);
// Type 2 (or 4 with `type`): a point at `pos`.
uint32_t AddPoint(DAHandle doc, const ANPos &pos, uint32_t tag = 1, uint64_t value = 0,
                  uint16_t type = AN_TYPE_POINT, uint32_t eventMask = 0, uint64_t userData = 0);
uint32_t AddRange(DAHandle doc, const ANPos &start, const ANPos &end, uint32_t tag = 1,
                  uint64_t userData = 0);
uint32_t AddText(DAHandle doc, const ANPos &pos, std::u16string_view text, uint32_t tag = 1,
                 uint64_t userData = 0);
uint32_t AddPlaceholder(DAHandle doc, const ANPos &pos, uint32_t tag = 1, uint64_t userData = 0);
uint32_t AddCutMark(DAHandle doc, const ANPos &pos, uint32_t tag = 1, uint64_t userData = 0);

// One call of the notification callback, with a copy of the record it was given
// (ANAnnoRecord for codes 1 and 2, ANEventRec for code 3, copied by its size).
struct Notification {
    uint16_t code;
    uint16_t detail;
    ANAnnoRecord record;  // codes 1 and 2
    ANEventRec event;     // code 3
};

// Records every notification; pass Notifications::Callback with a pointer to the
// object as callback value to ANInit or ANSetCallback.
struct Notifications {
    std::vector<Notification> calls;
    uint32_t result = 0;  // what the callback returns

    static uint32_t Callback(uint16_t code, uint16_t detail, void *record, void *self);
    // Installs this recorder as the document's callback.
    void Attach(DAHandle doc);
};

}  // namespace annotest

#endif  // ANNO_TESTS_ADD_HELPERS_H
