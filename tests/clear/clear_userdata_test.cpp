// Freeing the userData blocks that callers hand over with their annotations.
#include <gtest/gtest.h>

#include <cstdint>

#include "clear/clear_support.h"
#include "hosts/heap.h"

namespace {

using annotest::AddHilite;
using annotest::AddPoint;
using annotest::AddText;
using annotest::Doc;
using annotest::Listed;
using annotest::ListedEntries;
using annotest::PlainDocument;
using annotest::Pos;
using cleartest::MutableTable;
using cleartest::StoreHolds;
using cleartest::Tagged;

class ClearUserDataTest : public annotest::LeakCheckedTest {
 protected:
    static DAHandle NewDoc() {
        DAHandle doc = PlainDocument(8);
        EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        return doc;
    }
};

// A block from the process heap, as a caller hands one over.
uint64_t NewBlock() { return reinterpret_cast<uintptr_t>(ANHeapAlloc(16)); }
void FreeBlock(uint64_t block) { ANHeapFree(reinterpret_cast<void *>(block)); }

#if ANNO_HAVE_PLATFORM_CONTROLS
int64_t Blocks() { return anwin::heapBlocks(); }
#else
int64_t Blocks() { return 0; }
#endif

void SetOwnership(DAHandle doc, uint32_t tag, bool owns) {
    ANEntryTable *table = MutableTable(doc);
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        ANEntry &entry = ANSlot(table, i);
        if (entry.record.tag != tag) continue;
        entry.flags = static_cast<uint16_t>(owns ? entry.flags | ANENTRY_OWNS_USERDATA
                                                 : entry.flags & ~ANENTRY_OWNS_USERDATA);
    }
}

TEST_F(ClearUserDataTest, ABlockSharedByThreeEntriesIsFreedOnceAndEveryHolderLetsGo) {
    Doc doc(NewDoc());
    const uint64_t block = NewBlock();
    ASSERT_EQ(AddHilite(doc, Pos(1), Pos(2), 1, 0, block), AN_OK);
    ASSERT_EQ(AddHilite(doc, Pos(3), Pos(4), 2, 0, block), AN_OK);
    ASSERT_EQ(AddHilite(doc, Pos(5), Pos(6), 3, 0, block), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(7), 4, 0, AN_TYPE_POINT, 0, block), AN_OK);  // later, another type
    const int64_t before = Blocks();

    EXPECT_EQ(ANClearUserData(doc), AN_OK);
    if (ANNO_HAVE_PLATFORM_CONTROLS) {
        EXPECT_EQ(Blocks(), before - 1);
    }
    for (const Listed &view : ListedEntries(doc)) {
        EXPECT_EQ(view.record.userData, 0u) << "tag " << view.record.tag;
        EXPECT_EQ(view.flags & ANENTRY_OWNS_USERDATA, 0) << "tag " << view.record.tag;
    }
    EXPECT_EQ(ListedEntries(doc).size(), 4u) << "the annotations stay";
    EXPECT_TRUE(StoreHolds(doc));

    EXPECT_EQ(ANClearUserData(doc), AN_OK) << "a second call has nothing to free";
    if (ANNO_HAVE_PLATFORM_CONTROLS) {
        EXPECT_EQ(Blocks(), before - 1);
    }
}

TEST_F(ClearUserDataTest, FreesTheBlocksOfHighlightsAndTextsButNotOfPoints) {
    Doc doc(NewDoc());
    const uint64_t hilite = NewBlock();
    const uint64_t text = NewBlock();
    const uint64_t point = NewBlock();
    ASSERT_EQ(AddHilite(doc, Pos(1), Pos(2), 1, 0, hilite), AN_OK);
    ASSERT_EQ(AddText(doc, Pos(3), u"ab", 2, text), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(4), 3, 0, AN_TYPE_POINT, 0, point), AN_OK);
    const int64_t before = Blocks();

    EXPECT_EQ(ANClearUserData(doc), AN_OK);
    if (ANNO_HAVE_PLATFORM_CONTROLS) {
        EXPECT_EQ(Blocks(), before - 2);
    }
    const auto list = ListedEntries(doc);
    EXPECT_EQ(Tagged(list, 1)->record.userData, 0u);
    EXPECT_EQ(Tagged(list, 2)->record.userData, 0u);
    EXPECT_EQ(Tagged(list, 3)->record.userData, point) << "a point's value is the caller's";
    FreeBlock(point);
}

TEST_F(ClearUserDataTest, ValuesTheLibraryWasNotGivenAsBlocksAreNeverFreed) {
    Doc doc(NewDoc());
    // Entries without ownership stand for built highlights (an item id there) and
    // for entries copied from another document (the source's block).
    const uint64_t borrowed = NewBlock();
    const uint64_t itemId = 0x10005;
    ASSERT_EQ(AddHilite(doc, Pos(1), Pos(2), 1, 0, borrowed), AN_OK);
    ASSERT_EQ(AddHilite(doc, Pos(3), Pos(4), 2, 0, itemId), AN_OK);
    ASSERT_EQ(AddText(doc, Pos(5), u"t", 3, borrowed), AN_OK);
    SetOwnership(doc, 1, false);
    SetOwnership(doc, 2, false);
    SetOwnership(doc, 3, false);
    const int64_t before = Blocks();

    EXPECT_EQ(ANClearUserData(doc), AN_OK);
    if (ANNO_HAVE_PLATFORM_CONTROLS) {
        EXPECT_EQ(Blocks(), before);
    }
    const auto list = ListedEntries(doc);
    EXPECT_EQ(Tagged(list, 1)->record.userData, borrowed);
    EXPECT_EQ(Tagged(list, 2)->record.userData, itemId);
    EXPECT_EQ(Tagged(list, 3)->record.userData, borrowed);
    FreeBlock(borrowed);
}

TEST_F(ClearUserDataTest, AnOwnedBlockAlsoHeldByALaterBorrowerIsFreedAndTheBorrowerLetsGo) {
    Doc doc(NewDoc());
    const uint64_t block = NewBlock();
    ASSERT_EQ(AddHilite(doc, Pos(1), Pos(2), 1, 0, block), AN_OK);
    ASSERT_EQ(AddHilite(doc, Pos(3), Pos(4), 2, 0, block), AN_OK);
    SetOwnership(doc, 2, false);
    const int64_t before = Blocks();
    EXPECT_EQ(ANClearUserData(doc), AN_OK);
    if (ANNO_HAVE_PLATFORM_CONTROLS) {
        EXPECT_EQ(Blocks(), before - 1);
    }
    EXPECT_EQ(Tagged(ListedEntries(doc), 2)->record.userData, 0u);
}

TEST_F(ClearUserDataTest, AnswersQuietlyWithoutStateTableOrLock) {
    EXPECT_EQ(ANClearUserData(nullptr), AN_ERR_BADARG);
    {
        Doc bare(PlainDocument(2));
        EXPECT_EQ(ANClearUserData(bare), AN_OK);
    }
    Doc doc(NewDoc());
    EXPECT_EQ(ANClearUserData(doc), AN_OK) << "no table yet";

    const uint64_t block = NewBlock();
    ASSERT_EQ(AddHilite(doc, Pos(1), Pos(2), 1, 0, block), AN_OK);
    const int64_t before = Blocks();
    antk::resetCalls();
    antk::failCall(antk::Fn::DALockModuleData, 1, 61);
    EXPECT_EQ(ANClearUserData(doc), AN_OK);
    EXPECT_EQ(antk::calls(antk::Fn::DAUnlockModuleData), 1u) << "unlocked on every path";
    if (ANNO_HAVE_PLATFORM_CONTROLS) {
        EXPECT_EQ(Blocks(), before);
    }
    EXPECT_EQ(Tagged(ListedEntries(doc), 1)->record.userData, block);

    antk::failCall(antk::Fn::DARetrieveDocHandle, 1, 62);
    EXPECT_EQ(ANClearUserData(doc), 62u);
    EXPECT_EQ(Tagged(ListedEntries(doc), 1)->record.userData, block);

    EXPECT_EQ(ANClearUserData(doc), AN_OK);
    EXPECT_EQ(Tagged(ListedEntries(doc), 1)->record.userData, 0u);
}

}  // namespace
