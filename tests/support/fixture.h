// What the GoogleTest suites share: a fixture that fails a test which leaks a heap or
// global-memory block, documents that release themselves, adding each annotation type in
// its largest descriptor form, and a callback that records what it hears.
#ifndef ANNO_TESTS_FIXTURE_H
#define ANNO_TESTS_FIXTURE_H

#include <gtest/gtest.h>

#include <cstdint>
#include <string_view>
#include <vector>

#include "anno/anno.h"
#include "anno/toolkit.h"

#if !defined(_WIN32)
#include "anno/winapi_test.h"
#define ANNO_HAVE_PLATFORM_CONTROLS 1
#else
#define ANNO_HAVE_PLATFORM_CONTROLS 0
#endif

namespace annotest {

// Checks at tear-down that the live block counts are back where they started.
class LeakCheckedTest : public ::testing::Test {
 protected:
    void SetUp() override;
    void TearDown() override;

 private:
    int64_t heapAtStart_ = 0;
    int64_t globalAtStart_ = 0;
};

// A toolkit document, destroyed (after ANDeInit) when it goes out of scope.
class Doc {
 public:
    explicit Doc(DAHandle handle) : handle_(handle) {}
    ~Doc();
    Doc(const Doc &) = delete;
    Doc &operator=(const Doc &) = delete;
    DAHandle get() const { return handle_; }
    operator DAHandle() const { return handle_; }  // NOLINT(google-explicit-constructor)

 private:
    DAHandle handle_;
};

// A document of `count` plain items (type 1) in one chunk.
DAHandle PlainDocument(uint32_t count);

inline ANPos Pos(uint32_t item, uint32_t sub = ANPOS_NOSUBITEM, uint32_t kind = 0,
                 uint32_t index = 0) {
    return ANPos{item, sub, kind, index};
}
inline ANPos TextPos(uint32_t item, uint32_t sub, uint32_t index) {
    return ANPos{item, sub, ANPOS_ANNOTEXT, index};
}

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
// Types 6 and 7.
uint32_t AddMark(DAHandle doc, uint16_t type, const ANPos &pos, uint32_t tag = 1,
                 uint64_t userData = 0);

struct Notification {  // one call of the callback, with a copy of its record
    uint16_t code;
    uint16_t detail;
    ANAnnoRecord record;  // codes 1 and 2
    ANEventRec event;     // code 3
};

struct Notifications {  // records every notification; Attach makes it the callback
    std::vector<Notification> calls;
    uint32_t result = 0;  // what the callback returns

    static uint32_t Callback(uint16_t code, uint16_t detail, void *record, void *self);
    void Attach(DAHandle doc);
};

}  // namespace annotest

void PrintTo(const ANPos &pos, std::ostream *os);
bool operator==(const ANPos &a, const ANPos &b);

#endif  // ANNO_TESTS_FIXTURE_H
