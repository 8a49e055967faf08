// What every test of the library shares: a fixture that fails a test which leaks a
// heap or global-memory block or leaves an injected failure armed, and a document
// handle that releases itself.
#ifndef ANNO_TESTS_FIXTURE_H
#define ANNO_TESTS_FIXTURE_H

#include <gtest/gtest.h>

#include <cstdint>

#include "anno/anno.h"
#include "anno/toolkit.h"

#if !defined(_WIN32)
#include "anno/winapi_test.h"
#define ANNO_HAVE_PLATFORM_CONTROLS 1
#else
#define ANNO_HAVE_PLATFORM_CONTROLS 0
#endif

// Skips a test that needs the block counters or failure injection of the platform
// layer, which the system's own heap (Windows) does not offer.
#if ANNO_HAVE_PLATFORM_CONTROLS
#define ANNO_REQUIRE_PLATFORM_CONTROLS() (void)0
#else
#define ANNO_REQUIRE_PLATFORM_CONTROLS() \
    GTEST_SKIP() << "needs the failure injection and block counters of anno_winapi"
#endif

namespace annotest {

// Counts live heap and global-memory blocks at set-up and checks them at tear-down.
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

}  // namespace annotest

// Positions print readably in failure messages.
void PrintTo(const ANPos &pos, std::ostream *os);
bool operator==(const ANPos &a, const ANPos &b);

#endif  // ANNO_TESTS_FIXTURE_H
