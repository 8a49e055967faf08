#include "support/fixture.h"

#include <cstring>
#include <ostream>

#include "support/table_view.h"

namespace annotest {

void LeakCheckedTest::SetUp() {
    antk::clearFailures();
#if ANNO_HAVE_PLATFORM_CONTROLS
    anwin::clearFailures();
#endif
    heapAtStart_ = HeapBlocks();
    globalAtStart_ = GlobalBlocks();
}

void LeakCheckedTest::TearDown() {
    antk::clearFailures();
#if ANNO_HAVE_PLATFORM_CONTROLS
    anwin::clearFailures();
    EXPECT_EQ(anwin::globalLocks(), 0) << "global-memory blocks left locked";
#endif
    EXPECT_EQ(HeapBlocks(), heapAtStart_) << "process-heap blocks leaked";
    EXPECT_EQ(GlobalBlocks(), globalAtStart_) << "global-memory blocks leaked";
}

Doc::~Doc() {
    if (handle_ == nullptr) return;
    antk::clearFailures();
    EXPECT_EQ(DocumentRulesBroken(handle_), "");
    ANDeInit(handle_);
    antk::destroyDocument(handle_);
}

DAHandle PlainDocument(uint32_t count) {
    antk::DocumentBuilder builder;
    for (uint32_t i = 0; i < count; ++i) builder.item(antk::kItemParagraph);
    return builder.build();
}

uint32_t AddHilite(DAHandle doc, const ANPos &start, const ANPos &end, uint32_t tag, uint32_t style,
                   uint64_t userData, uint32_t eventMask, uint64_t value) {
    ANAnnoRecord d{72, tag, start, end, eventMask, 0, userData, value, {}, 0, 0, nullptr, 0, 0};
    d.style = style;
    return ANAddAnno(doc, AN_TYPE_HILITE, &d);
}

uint32_t AddPoint(DAHandle doc, const ANPos &pos, uint32_t tag, uint64_t value, uint16_t type,
                  uint32_t eventMask, uint64_t userData) {
    const ANAnnoRecord d{72, tag, pos, pos, eventMask, 0, userData, value, {}, 0, 0, nullptr, 0, 0};
    return ANAddAnno(doc, type, &d);
}

uint32_t AddRange(DAHandle doc, const ANPos &start, const ANPos &end, uint32_t tag,
                  uint64_t userData) {
    const ANRangeDesc d{sizeof(ANRangeDesc), tag, start, end, userData};
    return ANAddAnno(doc, AN_TYPE_RANGE, &d);
}

uint32_t AddText(DAHandle doc, const ANPos &pos, std::u16string_view text, uint32_t tag,
                 uint64_t userData) {
    const auto *units = reinterpret_cast<const uint16_t *>(text.data());
    const ANTextDesc d{sizeof(ANTextDesc), tag, pos, userData, units, uint32_t(text.size()), 0};
    return ANAddAnno(doc, AN_TYPE_TEXT, &d);
}

uint32_t AddMark(DAHandle doc, uint16_t type, const ANPos &pos, uint32_t tag, uint64_t userData) {
    const ANPointDesc d{sizeof(ANPointDesc), tag, pos, userData};
    return ANAddAnno(doc, type, &d);
}

uint32_t Notifications::Callback(uint16_t code, uint16_t detail, void *record, void *self) {
    auto *me = static_cast<Notifications *>(self);
    Notification n{code, detail, {}, {}};
    if (record != nullptr && code == ANNOTIFY_EVENT) std::memcpy(&n.event, record, sizeof n.event);
    if (record != nullptr && code != ANNOTIFY_EVENT)
        std::memcpy(&n.record, record, sizeof n.record);
    me->calls.push_back(n);
    return me->result;
}

void Notifications::Attach(DAHandle doc) { ANSetCallback(doc, &Notifications::Callback, this); }

}  // namespace annotest

void PrintTo(const ANPos &pos, std::ostream *os) { *os << annotest::PosText(pos); }

bool operator==(const ANPos &a, const ANPos &b) {
    return a.itemId == b.itemId && a.subItemId == b.subItemId && a.kind == b.kind &&
           a.textIndex == b.textIndex;
}
