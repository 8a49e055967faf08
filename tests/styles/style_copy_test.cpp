// The table copy that copying a document's annotations uses. It is internal to the
// library, so this suite compiles the table code in to reach it.
#include <gtest/gtest.h>

#include <cstring>

#include "styles/table.cpp"  // NOLINT(bugprone-suspicious-include)
#include "support/fixture.h"

namespace {

ANHiliteStyle Style(uint32_t id, uint32_t color1) {
    return ANHiliteStyle{ANHILITESTYLE_SIZE, id, ANSTYLE_COLOR1, color1, 0, 1, 2, 3};
}

class StyleCopyTest : public annotest::LeakCheckedTest {
 protected:
    void SetUp() override {
        LeakCheckedTest::SetUp();
        dest_ = ANNewStyleTable();
        src_ = ANNewStyleTable();
        ASSERT_TRUE(dest_ != nullptr && src_ != nullptr);
    }
    void TearDown() override {
        ANFreeStyleTable(dest_);
        ANFreeStyleTable(src_);
        LeakCheckedTest::TearDown();
    }
    void Fill(ANStyleTable *table, std::initializer_list<ANHiliteStyle> styles) {
        for (const ANHiliteStyle &s : styles) ASSERT_EQ(ANAddStyle(table, &s), AN_OK);
    }
    uint32_t Color1Of(const ANStyleTable *table, uint32_t id) {
        const ANHiliteStyle *s = ANFindStyle(table, id);
        return s == nullptr ? 0xBAD : s->color1;
    }

    ANStyleTable *dest_ = nullptr;
    ANStyleTable *src_ = nullptr;
};

TEST_F(StyleCopyTest, SourceStylesReplaceOrJoinAndTheOthersStay) {
    Fill(dest_, {Style(1, 0x10), Style(2, 0x20), Style(3, 0x30)});
    Fill(src_, {Style(2, 0x22), Style(9, 0x99), Style(1, 0x11)});
    EXPECT_EQ(ANCopyStyleTable(dest_, src_), AN_OK);
    ASSERT_EQ(dest_->count, 4);
    EXPECT_EQ(dest_->styles[0].styleId, 1u);
    EXPECT_EQ(dest_->styles[1].styleId, 2u);
    EXPECT_EQ(dest_->styles[2].styleId, 3u);
    EXPECT_EQ(dest_->styles[3].styleId, 9u);
    EXPECT_EQ(Color1Of(dest_, 1), 0x11u);
    EXPECT_EQ(Color1Of(dest_, 2), 0x22u);
    EXPECT_EQ(Color1Of(dest_, 3), 0x30u);
    EXPECT_EQ(Color1Of(dest_, 9), 0x99u);
    EXPECT_EQ(src_->count, 3) << "the source is only read";
}

TEST_F(StyleCopyTest, CopyingATableOntoItselfChangesNothing) {
    for (uint32_t id = 0; id < 9; ++id) Fill(src_, {Style(id, id * 3)});
    ASSERT_EQ(src_->capacity, 10);
    ANHiliteStyle before[9];
    std::memcpy(before, src_->styles, sizeof before);
    const ANHiliteStyle *array = src_->styles;
    EXPECT_EQ(ANCopyStyleTable(src_, src_), AN_OK);
    EXPECT_EQ(src_->count, 9);
    EXPECT_EQ(src_->capacity, 10);
    EXPECT_EQ(src_->styles, array);
    EXPECT_EQ(std::memcmp(before, src_->styles, sizeof before), 0);
}

TEST_F(StyleCopyTest, EmptyOrNullTables) {
    Fill(dest_, {Style(1, 0x10)});
    EXPECT_EQ(ANCopyStyleTable(dest_, src_), AN_OK) << "an empty source copies nothing";
    EXPECT_EQ(dest_->count, 1);
    EXPECT_EQ(ANCopyStyleTable(src_, dest_), AN_OK) << "into an empty table";
    EXPECT_EQ(Color1Of(src_, 1), 0x10u);
    EXPECT_EQ(ANCopyStyleTable(nullptr, src_), AN_ERR_BADARG);
    EXPECT_EQ(ANCopyStyleTable(dest_, nullptr), AN_ERR_BADARG);
}

TEST_F(StyleCopyTest, AFailedAddIsSkippedAndTheCopyGoesOn) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    for (uint32_t id = 0; id < 9; ++id) Fill(dest_, {Style(id, 1)});
    Fill(src_, {Style(100, 0x100), Style(5, 0x55)});
    anwin::failAllocation(1);  // the growth for id 100
    EXPECT_EQ(ANCopyStyleTable(dest_, src_), AN_OK);
    anwin::clearFailures();
    EXPECT_EQ(ANFindStyle(dest_, 100), nullptr);
    EXPECT_EQ(Color1Of(dest_, 5), 0x55u) << "the replacement after the failure happened";
    EXPECT_EQ(dest_->count, 9);
#endif
}

}  // namespace
