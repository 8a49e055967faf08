// Built and copied annotations next to the clearing operations: their userData is
// never taken for a caller's block, and a clear does not bring built ranges back.
#include <gtest/gtest.h>

#include <vector>

#include "hosts/heap.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::Doc;
using annotest::Listed;
using annotest::Pos;

// userData of every entry, in list order.
std::vector<uint64_t> UserData(DAHandle doc) {
    std::vector<uint64_t> values;
    for (const Listed &e : annotest::ListedEntries(doc)) values.push_back(e.record.userData);
    return values;
}

constexpr uint32_t kPlain = 0x81000000;

class BuiltAndCopiedUserDataTest : public annotest::LeakCheckedTest {};

int64_t HeapBlocks() {
#if ANNO_HAVE_PLATFORM_CONTROLS
    return anwin::heapBlocks();
#else
    return 0;
#endif
}

// A type-1 annotation carrying a heap block of the caller's.
void AddWithBlock(DAHandle doc, uint32_t tag, ANPos start, ANPos end) {
    const auto block = reinterpret_cast<uint64_t>(ANHeapAlloc(16));
    ASSERT_EQ(annotest::AddHilite(doc, start, end, tag, 0, block), AN_OK);
}

DAHandle TwoRanges(uint32_t *callerStart) {
    antk::DocumentBuilder b;
    for (int i = 0; i < 2; ++i) {
        const uint32_t first = b.item(antk::kItemParagraph);
        b.item(antk::kItemRangeEnd, kPlain);
        b.range(first, kPlain);
    }
    *callerStart = b.item(antk::kItemParagraph);
    b.item(antk::kItemParagraph);
    return b.build();
}

TEST_F(BuiltAndCopiedUserDataTest, ClearingUserDataAfterBuildingFreesOnlyTheCallersBlock) {
    uint32_t at = 0;
    Doc doc(TwoRanges(&at));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    AddWithBlock(doc, 1, Pos(at), Pos(at + 1));
    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    const std::vector<uint64_t> before = UserData(doc);
    ASSERT_EQ(before.size(), 3u);
    [[maybe_unused]] const int64_t blocks = HeapBlocks();

    EXPECT_EQ(ANClearUserData(doc), AN_OK);

    // The built entries keep their item ids; the caller's block is gone.
    EXPECT_EQ(UserData(doc), (std::vector<uint64_t>{before[0], before[1], 0}));
#if ANNO_HAVE_PLATFORM_CONTROLS
    EXPECT_EQ(HeapBlocks(), blocks - 1);
#endif
    EXPECT_EQ(ANClearUserData(doc), AN_OK) << "a second clear frees nothing";
#if ANNO_HAVE_PLATFORM_CONTROLS
    EXPECT_EQ(HeapBlocks(), blocks - 1);
#endif
}

TEST_F(BuiltAndCopiedUserDataTest, ClearingUserDataOfACopyLeavesTheSourcesBlocksAlone) {
    Doc src(annotest::PlainDocument(8));
    Doc dest(annotest::PlainDocument(8));
    ASSERT_EQ(ANInit(src, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(dest, nullptr, nullptr, nullptr), AN_OK);
    AddWithBlock(src, 1, Pos(1), Pos(3));
    AddWithBlock(src, 2, Pos(4), Pos(6));
    ASSERT_EQ(ANCopyAnnos(dest, src), AN_OK);
    const std::vector<uint64_t> copies = UserData(dest);
    ASSERT_EQ(copies.size(), 2u);
    [[maybe_unused]] const int64_t blocks = HeapBlocks();

    EXPECT_EQ(ANClearUserData(dest), AN_OK);
#if ANNO_HAVE_PLATFORM_CONTROLS
    EXPECT_EQ(HeapBlocks(), blocks);
#endif
    EXPECT_EQ(UserData(dest), copies);

    // The blocks stay the source's, which frees them once.
    EXPECT_EQ(ANClearUserData(src), AN_OK);
#if ANNO_HAVE_PLATFORM_CONTROLS
    EXPECT_EQ(HeapBlocks(), blocks - 2);
#endif
    EXPECT_EQ(UserData(src), (std::vector<uint64_t>{0, 0}));
}

TEST_F(BuiltAndCopiedUserDataTest, ClearedBuiltRangesAreNotBuiltAgain) {
    uint32_t at = 0;
    Doc doc(TwoRanges(&at));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    ASSERT_EQ(UserData(doc).size(), 2u);
    EXPECT_EQ(ANClearAnnos(doc, 0, 0), AN_OK);
    EXPECT_EQ(UserData(doc).size(), 2u) << "built tags have bit 31 set";
    EXPECT_EQ(ANClearAnnos(doc, ANCLEAR_MASK, kPlain), AN_OK);
    EXPECT_TRUE(UserData(doc).empty());

    ASSERT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_TRUE(UserData(doc).empty());
}

}  // namespace
