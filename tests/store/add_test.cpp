// Adding: every descriptor form and its normalised record, the entry stored for each
// type, the one notification per add, and who owns a userData block.
#include <gtest/gtest.h>

#include <cstring>
#include <vector>

#include "store/store_steps.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::Doc;
using annotest::Listed;
using annotest::ListedEntries;
using annotest::Notifications;
using annotest::Pos;
using annotest::TableOf;
using annotest::TextPos;
using antk::Fn;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;

// A caller descriptor built byte by byte, as the smaller forms are not C records.
class Descriptor {
 public:
    explicit Descriptor(uint32_t size) : bytes_(size < 8 ? 8 : size, 0) { Put(0, size); }
    template <typename T>
    Descriptor &Put(size_t offset, const T &value) {
        std::memcpy(bytes_.data() + offset, &value, sizeof(T));
        return *this;
    }
    const void *data() const { return bytes_.data(); }

 private:
    std::vector<unsigned char> bytes_;
};

// What one ANAddAnno on a fresh document did.
struct Added {
    uint32_t rc = 0;
    std::vector<Listed> entries;
    std::vector<annotest::Notification> calls;
};

Added AddToFreshDocument(uint16_t type, const void *descriptor) {
    Added out;
    Doc doc(annotest::PlainDocument(10));
    Notifications notes;
    EXPECT_EQ(ANInit(doc, nullptr, &Notifications::Callback, &notes), AN_OK);
    out.rc = ANAddAnno(doc, type, descriptor);
    EXPECT_TRUE(annotest::TableInvariantsHold(doc));
    out.entries = ListedEntries(doc);
    out.calls = notes.calls;
    return out;
}

// Adds a descriptor that must be accepted; the entry and the notified record.
struct Stored {
    Listed entry{};
    ANAnnoRecord notified{};
};

Stored AddAccepted(uint16_t type, const Descriptor &d) {
    const Added added = AddToFreshDocument(type, d.data());
    Stored out;
    EXPECT_EQ(added.rc, AN_OK);
    EXPECT_EQ(added.entries.size(), 1u);
    EXPECT_EQ(added.calls.size(), 1u);
    if (added.entries.size() == 1) out.entry = added.entries[0];
    if (added.calls.size() == 1) {
        EXPECT_EQ(added.calls[0].code, ANNOTIFY_ADDED);
        EXPECT_EQ(added.calls[0].detail, type);
        out.notified = added.calls[0].record;
    }
    return out;
}

class AddTest : public annotest::LeakCheckedTest {};

const ANPos kA = Pos(2, 7);
const ANPos kB = Pos(4);

TEST_F(AddTest, HiliteOf72BytesIsTakenWhole) {
    const Stored s = AddAccepted(AN_TYPE_HILITE, Descriptor(72)
                                                     .Put(4, 11u)
                                                     .Put(8, kA)
                                                     .Put(24, kB)
                                                     .Put(40, 0x3u)
                                                     .Put(48, uint64_t{0x1122334455})
                                                     .Put(56, uint64_t{77})
                                                     .Put(64, 0x40000007u));
    const ANAnnoRecord &r = s.entry.record;
    EXPECT_EQ(r.size, 72u);
    EXPECT_EQ(r.tag, 11u);
    EXPECT_EQ(r.start, kA);
    EXPECT_EQ(r.end, kB);
    EXPECT_EQ(r.eventMask, 0x3u);
    EXPECT_EQ(r.userData, 0x1122334455u);
    EXPECT_EQ(r.value, 77u);
    EXPECT_EQ(r.style, 0x40000007u);
    EXPECT_EQ(std::memcmp(&s.notified, &r, 72), 0) << "the callback sees what is stored";
}

TEST_F(AddTest, HiliteOf60BytesHasA32BitUserDataAndItsStyleAt56) {
    const Stored s = AddAccepted(AN_TYPE_HILITE, Descriptor(60)
                                                     .Put(4, 12u)
                                                     .Put(8, kA)
                                                     .Put(24, kB)
                                                     .Put(40, 0x5u)
                                                     .Put(44, 0xDEADBEEFu)
                                                     .Put(48, uint64_t{0x9999})
                                                     .Put(56, 0x123u));
    const ANAnnoRecord &r = s.entry.record;
    EXPECT_EQ(r.size, 72u);
    EXPECT_EQ(r.tag, 12u);
    EXPECT_EQ(r.eventMask, 0x5u);
    EXPECT_EQ(r.userData, 0xDEADBEEFu) << "zero-extended";
    EXPECT_EQ(r.value, 0u);
    EXPECT_EQ(r.style, 0x123u);
    EXPECT_EQ(s.notified.userData, 0xDEADBEEFu);
}

TEST_F(AddTest, HiliteOf48BytesHasItsStyleAt44AndNoUserData) {
    const Stored s =
        AddAccepted(AN_TYPE_HILITE,
                    Descriptor(48).Put(4, 13u).Put(8, kA).Put(24, kB).Put(40, 0x1u).Put(44, 0x77u));
    EXPECT_EQ(s.entry.record.style, 0x77u);
    EXPECT_EQ(s.entry.record.userData, 0u);
    EXPECT_EQ(s.entry.record.eventMask, 0x1u);
    EXPECT_EQ(s.entry.record.size, 72u);
    EXPECT_EQ(s.entry.flags, 0) << "no block handed over";
}

TEST_F(AddTest, PointOf72BytesEndsOneStepAfterItsStartAndTheCallbackSeesItsStart) {
    const Stored s = AddAccepted(AN_TYPE_POINT, Descriptor(72)
                                                    .Put(4, 21u)
                                                    .Put(8, Pos(7, kNo))
                                                    .Put(24, Pos(9))
                                                    .Put(40, 0x2u)
                                                    .Put(48, uint64_t{5})
                                                    .Put(56, uint64_t{6})
                                                    .Put(64, uint64_t{0xABCDEF0123}));
    const ANAnnoRecord &r = s.entry.record;
    EXPECT_EQ(r.start, Pos(7, kNo));
    EXPECT_EQ(r.end, Pos(7, 0)) << "0xFFFFFFFF steps to 0";
    EXPECT_EQ(r.userData, 5u);
    EXPECT_EQ(r.value, 6u);
    EXPECT_EQ(r.value64, 0xABCDEF0123u) << "type 2 keeps the value at 64";
    EXPECT_EQ(s.notified.end, Pos(7, kNo)) << "the notified end equals the start";
    EXPECT_EQ(s.entry.flags, 0) << "points never own a block";
}

TEST_F(AddTest, PointInsideTextEndsOneTextIndexLater) {
    const Stored s = AddAccepted(AN_TYPE_POINT, Descriptor(72).Put(8, TextPos(7, 3, 9)));
    EXPECT_EQ(s.entry.record.end, TextPos(7, 3, 10));
    EXPECT_EQ(s.notified.end, TextPos(7, 3, 9));
}

TEST_F(AddTest, ValuePointOf72BytesKeepsValueButNotTheValueAt64) {
    const Stored s =
        AddAccepted(AN_TYPE_VALUE,
                    Descriptor(72).Put(8, Pos(3, 4)).Put(56, uint64_t{42}).Put(64, uint64_t{0x77}));
    EXPECT_EQ(s.entry.record.value, 42u);
    EXPECT_EQ(s.entry.record.value64, 0u);
    EXPECT_EQ(s.entry.record.end, Pos(3, 5));
}

TEST_F(AddTest, PointOf64BytesTakesA32BitUserDataAndTheValueAt56) {
    for (uint16_t type : {AN_TYPE_POINT, AN_TYPE_VALUE}) {
        const Stored s = AddAccepted(type, Descriptor(64)
                                               .Put(4, 3u)
                                               .Put(8, Pos(3))
                                               .Put(24, Pos(1))
                                               .Put(40, 0x10u)
                                               .Put(44, 0x4444u)
                                               .Put(56, uint64_t{0x5555}));
        const ANAnnoRecord &r = s.entry.record;
        EXPECT_EQ(r.start, Pos(3)) << "the given end is ignored";
        EXPECT_EQ(r.userData, 0x4444u);
        EXPECT_EQ(r.value, 0u);
        EXPECT_EQ(r.eventMask, 0x10u);
        EXPECT_EQ(r.value64, type == AN_TYPE_POINT ? 0x5555u : 0u);
        EXPECT_EQ(s.notified.value64, 0x5555u) << "normalised before the entry is made";
    }
}

TEST_F(AddTest, PointOf32BytesNamesOnlyAnItem) {
    const Stored s = AddAccepted(
        AN_TYPE_POINT,
        Descriptor(32).Put(4, 8u).Put(8, 9u).Put(12, 0xFFu).Put(16, 0x4u).Put(24, uint64_t{0x66}));
    EXPECT_EQ(s.entry.record.start, Pos(9, 0, 0, 0));
    EXPECT_EQ(s.entry.record.end, Pos(9, 1, 0, 0));
    EXPECT_EQ(s.entry.record.eventMask, 0x4u);
    EXPECT_EQ(s.entry.record.value64, 0x66u);
    EXPECT_EQ(s.entry.record.tag, 8u);
    EXPECT_EQ(AddToFreshDocument(AN_TYPE_VALUE, Descriptor(32).data()).rc, AN_ERR_BADARG)
        << "type 4 has no 32-byte form";
}

TEST_F(AddTest, RangeFormsCarryTheirUserDataAndAMarkedValue) {
    struct Form {
        uint32_t size;
        uint64_t userData;
    };
    for (const Form form : {Form{48, 0x1234567890}, Form{44, 0x90}, Form{40, 0}}) {
        Descriptor d(form.size);
        d.Put(4, 31u).Put(8, Pos(5)).Put(24, Pos(2));
        if (form.size == 48) d.Put(40, uint64_t{0x1234567890});
        if (form.size == 44) d.Put(40, 0x90u);
        const Stored s = AddAccepted(AN_TYPE_RANGE, d);
        const ANAnnoRecord &r = s.entry.record;
        EXPECT_EQ(r.size, 64u) << form.size;
        EXPECT_EQ(r.start, Pos(2)) << "start and end put in order";
        EXPECT_EQ(r.end, Pos(5));
        EXPECT_EQ(r.userData, form.userData);
        EXPECT_EQ(r.value, 0xFFFFFFFF00000000u);
        EXPECT_EQ(r.eventMask, 0u);
        EXPECT_EQ(s.notified.start, Pos(2));
        EXPECT_EQ(s.entry.flags, form.userData != 0 ? ANENTRY_OWNS_USERDATA : 0);
    }
}

TEST_F(AddTest, TextDescriptorGivesItsPositionAndACopyOfItsText) {
    std::u16string text = u"hello";
    const Stored s = AddAccepted(AN_TYPE_TEXT, Descriptor(48)
                                                   .Put(4, 41u)
                                                   .Put(8, Pos(3))
                                                   .Put(24, uint64_t{0x8888})
                                                   .Put(32, text.data())
                                                   .Put(40, 5u));
    text[0] = u'J';  // the caller's text is not kept
    EXPECT_EQ(s.entry.text, u"hello");
    EXPECT_EQ(s.entry.record.size, 96u);
    EXPECT_EQ(s.entry.record.start, Pos(3));
    EXPECT_EQ(s.entry.record.end, Pos(3, 0));
    EXPECT_EQ(s.entry.record.userData, 0x8888u);
    EXPECT_EQ(s.entry.flags, ANENTRY_OWNS_USERDATA);
    EXPECT_EQ(s.notified.textLength, 5u);
    EXPECT_EQ(s.notified.end, Pos(3));
    EXPECT_EQ(s.notified.textBuffer, nullptr);
}

TEST_F(AddTest, PlaceholderAndCutMarkTakeOnePositionAndA64Or32BitUserData) {
    for (uint16_t type : {AN_TYPE_PLACEHOLDER, AN_TYPE_CUTMARK}) {
        Stored s = AddAccepted(
            type, Descriptor(32).Put(4, 51u).Put(8, Pos(3, 2)).Put(24, uint64_t{0x123456789}));
        EXPECT_EQ(s.entry.record.size, 64u);
        EXPECT_EQ(s.entry.record.start, Pos(3, 2));
        EXPECT_EQ(s.entry.record.end, Pos(3, 3));
        EXPECT_EQ(s.entry.record.userData, 0x123456789u);
        EXPECT_EQ(s.entry.flags, 0) << "types 6 and 7 never own a block";
        s = AddAccepted(type, Descriptor(28).Put(8, Pos(3, 2)).Put(24, 0x77u));
        EXPECT_EQ(s.entry.record.userData, 0x77u);
    }
}

TEST_F(AddTest, SizesATypeDoesNotTakeAreRefusedAndAddNothing) {
    struct Case {
        uint16_t type;
        uint32_t size;
    };
    const Case refused[] = {{1, 56}, {1, 64}, {2, 48}, {2, 60}, {4, 48}, {3, 64}, {3, 32},
                            {5, 72}, {5, 32}, {6, 64}, {6, 24}, {7, 48}, {7, 0}};
    for (const Case &c : refused) {
        const Added added = AddToFreshDocument(c.type, Descriptor(96).Put(0, c.size).data());
        EXPECT_EQ(added.rc, AN_ERR_BADARG) << "type " << c.type << " size " << c.size;
        EXPECT_TRUE(added.entries.empty());
        EXPECT_TRUE(added.calls.empty());
    }
}

TEST_F(AddTest, BadTypesNullPointersAndDocumentsWithoutStateAreRefused) {
    const Descriptor d(72);
    EXPECT_EQ(AddToFreshDocument(0, d.data()).rc, AN_ERR_BADARG);
    EXPECT_EQ(AddToFreshDocument(8, d.data()).rc, AN_ERR_BADARG);
    EXPECT_EQ(AddToFreshDocument(AN_TYPE_HILITE, nullptr).rc, AN_ERR_BADARG);
    EXPECT_EQ(ANAddAnno(nullptr, AN_TYPE_HILITE, d.data()), AN_ERR_BADARG);
    const Added nullText =
        AddToFreshDocument(AN_TYPE_TEXT, Descriptor(48).Put(8, Pos(1)).Put(40, 3u).data());
    EXPECT_EQ(nullText.rc, AN_ERR_BADARG) << "three units of text at a null pointer";

    Doc doc(annotest::PlainDocument(2));
    EXPECT_EQ(ANAddAnno(doc, AN_TYPE_HILITE, d.data()), AN_ERR_NOSTATE);
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::DAGetAnno, 1, 77);
    EXPECT_EQ(ANAddAnno(doc, AN_TYPE_HILITE, d.data()), 77u);
    EXPECT_EQ(TableOf(doc), nullptr);
}

TEST_F(AddTest, HiliteGivenBackwardsIsStoredAndAnnouncedInOrder) {
    const Stored s = AddAccepted(AN_TYPE_HILITE, Descriptor(72).Put(8, kB).Put(24, kA));
    EXPECT_EQ(s.entry.record.start, kA);
    EXPECT_EQ(s.entry.record.end, kB);
    EXPECT_EQ(s.notified.start, kA);
    EXPECT_EQ(s.notified.end, kB);
}

TEST_F(AddTest, UserDataOwnershipGoesOnlyToBlocksOfTypesOneThreeAndFive) {
    Doc doc(annotest::PlainDocument(10));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ADD_OK(annotest::AddHilite(doc, Pos(1), Pos(2), 1, 0, 0x10));
    ADD_OK(annotest::AddHilite(doc, Pos(1), Pos(2), 2, 0, 0));
    ADD_OK(annotest::AddPoint(doc, Pos(3), 3, 0, AN_TYPE_POINT, 0, 0x30));
    ADD_OK(annotest::AddPoint(doc, Pos(3), 4, 0, AN_TYPE_VALUE, 0, 0x40));
    ADD_OK(annotest::AddRange(doc, Pos(5), Pos(6), 5, 0x50));
    ADD_OK(annotest::AddText(doc, Pos(7), u"t", 6, 0x60));
    ADD_OK(annotest::AddPlaceholder(doc, Pos(8), 7, 0x70));
    ADD_OK(annotest::AddCutMark(doc, Pos(9), 8, 0x80));
    for (const Listed &e : ListedEntries(doc)) {
        const bool owns = e.record.tag == 1 || e.record.tag == 5 || e.record.tag == 6;
        EXPECT_EQ(e.flags, owns ? ANENTRY_OWNS_USERDATA : 0) << "tag " << e.record.tag;
    }
}

TEST_F(AddTest, EveryAddIsAnnouncedOnceAndAFailedOneNotAtAll) {
    Doc doc(annotest::PlainDocument(10));
    Notifications notes;
    ASSERT_EQ(ANInit(doc, nullptr, &Notifications::Callback, &notes), AN_OK);
    notes.result = 99;  // not used by adding
    ADD_OK(annotest::AddRange(doc, Pos(1), Pos(3), 1));
    ADD_OK(annotest::AddRange(doc, Pos(3), Pos(4), 2));  // merged, still announced
    ASSERT_EQ(notes.calls.size(), 2u);
    EXPECT_EQ(notes.calls[1].detail, AN_TYPE_RANGE);
    EXPECT_EQ(notes.calls[1].record.tag, 2u);

    // Range splitting finds the state again: its failure is passed on, unannounced.
    antk::failCall(Fn::DAGetAnno, 2, 66);
    EXPECT_STEP(66u, annotest::AddRange(doc, Pos(6), Pos(8), 3));
    EXPECT_EQ(notes.calls.size(), 2u);
    EXPECT_EQ(TableOf(doc)->count, 1);

    ASSERT_EQ(ANSetCallback(doc, nullptr, nullptr), AN_OK);
    ADD_OK(annotest::AddPoint(doc, Pos(5)));  // no callback: added all the same
    EXPECT_EQ(TableOf(doc)->count, 2);
    EXPECT_EQ(notes.calls.size(), 2u);
}

}  // namespace
