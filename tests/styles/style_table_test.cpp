// Highlight style tables: global tables by handle and the per-document table.
#include <gtest/gtest.h>

#include <cstring>
#include <vector>

#include "binding/instance.h"
#include "hosts/heap.h"
#include "styles/styles.h"
#include "support/fixture.h"

namespace {

using annotest::Doc;
using annotest::PlainDocument;
using antk::Fn;

ANHiliteStyle Style(uint32_t id, uint32_t flags = ANSTYLE_COLOR1 | ANSTYLE_COLOR2,
                    uint32_t color1 = 0x010203, uint32_t color2 = 0x040506, uint16_t attr1 = 7,
                    uint16_t attr2 = 8, uint32_t reserved = 0) {
    return ANHiliteStyle{ANHILITESTYLE_SIZE, id, flags, color1, color2, attr1, attr2, reserved};
}

bool SameBytes(const ANHiliteStyle &a, const ANHiliteStyle &b) {
    return std::memcmp(&a, &b, sizeof(ANHiliteStyle)) == 0;
}

// A record of the older form in a block of exactly its 24 bytes, so that a read of
// bytes it does not have shows up under the address sanitizer.
class OldFormRecord {
 public:
    OldFormRecord(uint32_t id, uint32_t flags, uint32_t color1, uint32_t color2, uint16_t attr1)
        : bytes_(ANHILITESTYLE_SIZE_OLD) {
        ANHiliteStyle full{ANHILITESTYLE_SIZE_OLD, id, flags, color1, color2, attr1, 0, 0};
        std::memcpy(bytes_.data(), &full, ANHILITESTYLE_SIZE_OLD);
    }
    const ANHiliteStyle *get() const {
        return reinterpret_cast<const ANHiliteStyle *>(bytes_.data());
    }

 private:
    std::vector<unsigned char> bytes_;
};

class StyleTableTest : public annotest::LeakCheckedTest {
 protected:
    void SetUp() override {
        LeakCheckedTest::SetUp();
        ASSERT_EQ(ANInitGlobalHiliteStyles(&table_), AN_OK);
        ASSERT_NE(table_, nullptr);
    }
    void TearDown() override {
        EXPECT_EQ(ANDeInitGlobalHiliteStyles(table_), AN_OK);
        LeakCheckedTest::TearDown();
    }

    // Adds styles with ids first .. first + n - 1.
    void AddRange(uint32_t first, uint32_t n) {
        for (uint32_t id = first; id < first + n; ++id) {
            const ANHiliteStyle style = Style(id);
            ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &style), AN_OK) << id;
        }
    }

    ANStyleTable *table_ = nullptr;
};

TEST_F(StyleTableTest, NewTableIsEmptyAndFindsNothing) {
    EXPECT_EQ(table_->styles, nullptr);
    EXPECT_EQ(table_->count, 0);
    EXPECT_EQ(table_->capacity, 0);
    ANHiliteStyle out = Style(99);
    EXPECT_EQ(ANGetGlobalHiliteStyle(table_, 0, &out), AN_ERR_NOTFOUND);
    EXPECT_EQ(ANGetGlobalHiliteStyle(table_, 0, nullptr), AN_ERR_NOTFOUND);
    EXPECT_TRUE(SameBytes(out, Style(99))) << "a failed lookup leaves the record alone";
}

TEST_F(StyleTableTest, AddedStylesAreFoundWithAllTwentyEightBytes) {
    const ANHiliteStyle a = Style(3, 0x7, 0x112233, 0x445566, 0x1111, 0x2222, 0xDEADBEEF);
    const ANHiliteStyle b = Style(0xFFFFFFFF, 0x0, 0x1, 0x2, 0, 0xFFFF, 5);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &a), AN_OK);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &b), AN_OK);
    EXPECT_EQ(table_->count, 2);
    EXPECT_EQ(table_->capacity, 10) << "the first add allocates ten slots";

    ANHiliteStyle out{};
    ASSERT_EQ(ANGetGlobalHiliteStyle(table_, 3, &out), AN_OK);
    EXPECT_TRUE(SameBytes(out, a));
    ASSERT_EQ(ANGetGlobalHiliteStyle(table_, 0xFFFFFFFF, &out), AN_OK);
    EXPECT_TRUE(SameBytes(out, b));
    EXPECT_EQ(ANGetGlobalHiliteStyle(table_, 3, nullptr), AN_OK) << "existence test only";
    EXPECT_EQ(ANGetGlobalHiliteStyle(table_, 4, &out), AN_ERR_NOTFOUND);
}

TEST_F(StyleTableTest, AddingAPresentIdReplacesItsWholeSlotInPlace) {
    AddRange(1, 4);
    const ANHiliteStyle before = Style(3, 0x7, 0xAAAAAA, 0xBBBBBB, 9, 10, 0x12345678);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &before), AN_OK);
    // The replacement clears flag bits and the reserved field the old record had.
    const ANHiliteStyle after = Style(3, ANSTYLE_COLOR2, 0xCCCCCC, 0, 0, 1, 0);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &after), AN_OK);

    EXPECT_EQ(table_->count, 4);
    EXPECT_TRUE(SameBytes(table_->styles[2], after)) << "the slot of id 3 keeps its place";
    for (uint32_t i = 0; i < 4; ++i) EXPECT_EQ(table_->styles[i].styleId, i + 1);
}

TEST_F(StyleTableTest, TheTenthStyleGrowsTheTableBeforeItIsStored) {
    AddRange(100, 9);
    EXPECT_EQ(table_->capacity, 10);
    EXPECT_EQ(table_->count, 9);
    AddRange(109, 1);
    EXPECT_EQ(table_->capacity, 20);
    EXPECT_EQ(table_->count, 10);
    AddRange(110, 9);
    EXPECT_EQ(table_->capacity, 20);
    AddRange(119, 1);
    EXPECT_EQ(table_->capacity, 30);
    for (uint32_t i = 0; i < table_->count; ++i) {
        EXPECT_EQ(table_->styles[i].styleId, 100 + i) << "records keep the order of adding";
    }
    ANHiliteStyle out{};
    ASSERT_EQ(ANGetGlobalHiliteStyle(table_, 100, &out), AN_OK);
    EXPECT_TRUE(SameBytes(out, Style(100))) << "growth keeps the records";
}

TEST_F(StyleTableTest, OlderFormIsWidenedWithAttr2AllOnesAndReservedZero) {
    const OldFormRecord old(42, 0x5, 0x0A0B0C, 0x0D0E0F, 0x3344);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, old.get()), AN_OK);
    ANHiliteStyle out{};
    ASSERT_EQ(ANGetGlobalHiliteStyle(table_, 42, &out), AN_OK);
    EXPECT_TRUE(SameBytes(out, Style(42, 0x5, 0x0A0B0C, 0x0D0E0F, 0x3344, 0xFFFF, 0)));

    // Replacing a full record with an old one also clears what the old form lacks.
    const ANHiliteStyle full = Style(43, 0x1, 1, 2, 3, 4, 0x77777777);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &full), AN_OK);
    const OldFormRecord replacement(43, 0x2, 5, 6, 7);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, replacement.get()), AN_OK);
    ASSERT_EQ(ANGetGlobalHiliteStyle(table_, 43, &out), AN_OK);
    EXPECT_TRUE(SameBytes(out, Style(43, 0x2, 5, 6, 7, 0xFFFF, 0)));
}

TEST_F(StyleTableTest, BadArgumentsAreRefusedAndLeaveTheTableAsItWas) {
    AddRange(1, 2);
    ANHiliteStyle bad = Style(1, 0, 0xEEEEEE);
    for (uint32_t size : {0u, 20u, 23u, 25u, 26u, 27u, 29u, 32u}) {
        bad.size = size;
        EXPECT_EQ(ANAddGlobalHiliteStyle(table_, &bad), AN_ERR_BADARG) << size;
        bad.styleId = 77;
        EXPECT_EQ(ANAddGlobalHiliteStyle(table_, &bad), AN_ERR_BADARG) << size;
        bad.styleId = 1;
    }
    EXPECT_EQ(table_->count, 2);
    ANHiliteStyle out{};
    ASSERT_EQ(ANGetGlobalHiliteStyle(table_, 1, &out), AN_OK);
    EXPECT_TRUE(SameBytes(out, Style(1)));

    const ANHiliteStyle good = Style(5);
    EXPECT_EQ(ANAddGlobalHiliteStyle(nullptr, &good), AN_ERR_BADARG);
    EXPECT_EQ(ANAddGlobalHiliteStyle(table_, nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANGetGlobalHiliteStyle(nullptr, 1, &out), AN_ERR_BADARG);
    EXPECT_EQ(ANInitGlobalHiliteStyles(nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANDeInitGlobalHiliteStyles(nullptr), AN_ERR_BADARG);
}

// Capacity is 16-bit: at 65530 slots the next growth would pass 65535, so a new id is
// refused with 13 and the table stays as it was; replacing a present id still works.
TEST_F(StyleTableTest, AtTheSixteenBitLimitNewIdsAreRefusedWithoutWrapping) {
    constexpr uint16_t kLimit = 65530;
    auto *styles = static_cast<ANHiliteStyle *>(ANHeapAlloc(sizeof(ANHiliteStyle) * kLimit));
    ASSERT_NE(styles, nullptr);
    for (uint32_t i = 0; i < kLimit; ++i) styles[i] = Style(i);
    table_->styles = styles;
    table_->capacity = kLimit;
    table_->count = kLimit - 2;

    AddRange(kLimit - 2, 1);
    EXPECT_EQ(table_->count, kLimit - 1) << "the last spare slot but one is still usable";

    const ANHiliteStyle extra = Style(900000);
    EXPECT_EQ(ANAddGlobalHiliteStyle(table_, &extra), AN_ERR_NOMEM);
    EXPECT_EQ(table_->styles, styles);
    EXPECT_EQ(table_->capacity, kLimit);
    EXPECT_EQ(table_->count, kLimit - 1);
    EXPECT_EQ(ANGetGlobalHiliteStyle(table_, 900000, nullptr), AN_ERR_NOTFOUND);

    const ANHiliteStyle replaced = Style(kLimit - 2, 0, 0x999999);
    EXPECT_EQ(ANAddGlobalHiliteStyle(table_, &replaced), AN_OK);
    EXPECT_TRUE(SameBytes(table_->styles[kLimit - 2], replaced));
}

TEST_F(StyleTableTest, OutOfMemoryAtTheFirstAllocationLeavesTheTableEmpty) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    const ANHiliteStyle style = Style(1);
    anwin::failAllocation(1);
    EXPECT_EQ(ANAddGlobalHiliteStyle(table_, &style), AN_ERR_NOMEM);
    anwin::clearFailures();
    EXPECT_EQ(table_->styles, nullptr);
    EXPECT_EQ(table_->count, 0);
    EXPECT_EQ(table_->capacity, 0);
    EXPECT_EQ(ANGetGlobalHiliteStyle(table_, 1, nullptr), AN_ERR_NOTFOUND);

    anwin::resetCounters();
    const OldFormRecord old(2, 1, 2, 3, 4);
    EXPECT_EQ(ANAddGlobalHiliteStyle(table_, old.get()), AN_OK);
    EXPECT_EQ(anwin::allocations(), 1u) << "the older form needs no allocation of its own";
#endif
}

TEST_F(StyleTableTest, OutOfMemoryAtGrowthLeavesTheTableUnchanged) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    AddRange(1, 9);
    const ANHiliteStyle *array = table_->styles;
    const ANHiliteStyle style = Style(10);
    anwin::failAllocation(1);
    EXPECT_EQ(ANAddGlobalHiliteStyle(table_, &style), AN_ERR_NOMEM);
    anwin::clearFailures();
    EXPECT_EQ(table_->styles, array);
    EXPECT_EQ(table_->count, 9);
    EXPECT_EQ(table_->capacity, 10);
    for (uint32_t i = 0; i < 9; ++i) EXPECT_TRUE(SameBytes(table_->styles[i], Style(i + 1)));

    // Replacing needs no room and still works; the failed id can be added later.
    const ANHiliteStyle replaced = Style(4, 0);
    EXPECT_EQ(ANAddGlobalHiliteStyle(table_, &replaced), AN_OK);
    EXPECT_EQ(ANAddGlobalHiliteStyle(table_, &style), AN_OK);
    EXPECT_EQ(table_->capacity, 20);
#endif
}

TEST_F(StyleTableTest, OutOfMemoryMakingATableGives13AndANullHandle) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    ANStyleTable *other = table_;
    anwin::failAllocation(1);
    EXPECT_EQ(ANInitGlobalHiliteStyles(&other), AN_ERR_NOMEM);
    anwin::clearFailures();
    EXPECT_EQ(other, nullptr);
#endif
}

// ---- The per-document table and the global table bound at ANInit ----------------

class DocumentStyleTest : public StyleTableTest {};

TEST_F(DocumentStyleTest, DocumentStyleShadowsTheGlobalOneWithTheSameId) {
    Doc doc(PlainDocument(1));
    ASSERT_EQ(ANInit(doc, table_, nullptr, nullptr), AN_OK);
    const ANHiliteStyle global7 = Style(7, 0x1, 0x111111);
    const ANHiliteStyle global8 = Style(8, 0x2, 0x222222);
    const ANHiliteStyle local7 = Style(7, 0x4, 0x777777);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &global7), AN_OK);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &global8), AN_OK);

    ANHiliteStyle out{};
    EXPECT_EQ(ANGetHiliteStyle(doc, 7, &out), 1u) << "found in the global table";
    EXPECT_TRUE(SameBytes(out, global7));

    ASSERT_EQ(ANAddHiliteStyle(doc, &local7), AN_OK);
    EXPECT_EQ(ANGetHiliteStyle(doc, 7, &out), 1u);
    EXPECT_TRUE(SameBytes(out, local7));
    EXPECT_EQ(ANGetHiliteStyle(doc, 8, &out), 1u);
    EXPECT_TRUE(SameBytes(out, global8));
    EXPECT_EQ(ANGetHiliteStyle(doc, 8, nullptr), 1u);

    ANHiliteStyle untouched = Style(55);
    EXPECT_EQ(ANGetHiliteStyle(doc, 9, &untouched), 0u);
    EXPECT_TRUE(SameBytes(untouched, Style(55)));

    // Adding through a document never reaches the global table.
    EXPECT_TRUE(SameBytes(table_->styles[0], global7));
    EXPECT_EQ(table_->count, 2);
}

TEST_F(DocumentStyleTest, DocumentAddsTakeBothFormsAndRefuseBadSizes) {
    Doc doc(PlainDocument(1));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const OldFormRecord old(3, 0x3, 0x10, 0x20, 0x30);
    ASSERT_EQ(ANAddHiliteStyle(doc, old.get()), AN_OK);
    ANHiliteStyle out{};
    ASSERT_EQ(ANGetHiliteStyle(doc, 3, &out), 1u);
    EXPECT_TRUE(SameBytes(out, Style(3, 0x3, 0x10, 0x20, 0x30, 0xFFFF, 0)));
    ANHiliteStyle bad = Style(4);
    bad.size = 32;
    EXPECT_EQ(ANAddHiliteStyle(doc, &bad), AN_ERR_BADARG);
    EXPECT_EQ(ANAddHiliteStyle(doc, nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANGetHiliteStyle(doc, 4, nullptr), 0u);
    EXPECT_EQ(ANGetHiliteStyle(doc, 3, nullptr), 1u) << "no global table is needed";
}

TEST_F(DocumentStyleTest, DocumentCallsWithoutAStateAnswerAsEachSays) {
    const ANHiliteStyle style = Style(1);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &style), AN_OK);
    EXPECT_EQ(ANAddHiliteStyle(nullptr, &style), AN_ERR_BADARG);
    EXPECT_EQ(ANGetHiliteStyle(nullptr, 1, nullptr), 0u) << "a lookup answers 0, not 15";

    Doc doc(PlainDocument(1));
    EXPECT_EQ(ANAddHiliteStyle(doc, &style), AN_ERR_NOSTATE);
    EXPECT_EQ(ANGetHiliteStyle(doc, 1, nullptr), 0u);

    ASSERT_EQ(ANInit(doc, table_, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::DAGetAnno, 1, 61);
    EXPECT_EQ(ANAddHiliteStyle(doc, &style), 61u);
    antk::failCall(Fn::DAGetAnno, 1, 61);
    EXPECT_EQ(ANGetHiliteStyle(doc, 1, nullptr), 0u);
    EXPECT_EQ(ANGetHiliteStyle(doc, 1, nullptr), 1u);
}

// A state whose own table could not be made refuses adds with 15 and finds nothing,
// not even in the global table.
TEST_F(DocumentStyleTest, StateWithoutItsOwnTableRefusesAddsAndFindsNothing) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    const ANHiliteStyle style = Style(1);
    ASSERT_EQ(ANAddGlobalHiliteStyle(table_, &style), AN_OK);
    Doc doc(PlainDocument(1));
    anwin::failAllocation(2);
    ASSERT_EQ(ANInit(doc, table_, nullptr, nullptr), AN_OK);
    anwin::clearFailures();
    ASSERT_EQ(static_cast<ANInstance *>(antk::annoSlot(doc))->styles, nullptr);
    EXPECT_EQ(ANAddHiliteStyle(doc, &style), AN_ERR_BADARG);
    EXPECT_EQ(ANGetHiliteStyle(doc, 1, nullptr), 0u);
#endif
}

}  // namespace
