#include "support/fixture.h"

#include <ostream>

namespace annotest {

void LeakCheckedTest::SetUp() {
    antk::clearFailures();
#if ANNO_HAVE_PLATFORM_CONTROLS
    anwin::clearFailures();
    heapAtStart_ = anwin::heapBlocks();
    globalAtStart_ = anwin::globalBlocks();
#endif
}

void LeakCheckedTest::TearDown() {
    antk::clearFailures();
#if ANNO_HAVE_PLATFORM_CONTROLS
    anwin::clearFailures();
    EXPECT_EQ(anwin::heapBlocks(), heapAtStart_) << "process-heap blocks leaked";
    EXPECT_EQ(anwin::globalBlocks(), globalAtStart_) << "global-memory blocks leaked";
    EXPECT_EQ(anwin::globalLocks(), 0) << "global-memory blocks left locked";
#endif
}

Doc::~Doc() {
    if (handle_ == nullptr) return;
    antk::clearFailures();
    ANDeInit(handle_);
    antk::destroyDocument(handle_);
}

DAHandle PlainDocument(uint32_t count) {
    antk::DocumentBuilder builder;
    for (uint32_t i = 0; i < count; ++i) builder.item(antk::kItemParagraph);
    return builder.build();
}

}  // namespace annotest

void PrintTo(const ANPos &pos, std::ostream *os) {
    *os << "(" << pos.itemId << ", ";
    if (pos.subItemId == ANPOS_NOSUBITEM) {
        *os << "-";
    } else {
        *os << pos.subItemId;
    }
    *os << ", " << pos.kind << ", " << pos.textIndex << ")";
}

bool operator==(const ANPos &a, const ANPos &b) {
    return a.itemId == b.itemId && a.subItemId == b.subItemId && a.kind == b.kind &&
           a.textIndex == b.textIndex;
}
