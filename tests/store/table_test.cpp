// The annotation table: making it, growing it, its limit, and the lists it keeps.
#include <gtest/gtest.h>

#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::AddPoint;
using annotest::Doc;
using annotest::Pos;
using annotest::TableInvariantsHold;
using annotest::TableOf;

class TableTest : public annotest::LeakCheckedTest {};

TEST_F(TableTest, FirstInsertionMakesATableOfTenWithSlotZeroInUse) {
    Doc doc(annotest::PlainDocument(4));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    EXPECT_EQ(TableOf(doc), nullptr);
    ASSERT_EQ(AddPoint(doc, Pos(2)), AN_OK);
    const ANEntryTable *t = TableOf(doc);
    ASSERT_NE(t, nullptr);
    EXPECT_EQ(t->count, 1);
    EXPECT_EQ(t->capacity, 10);
    EXPECT_EQ(t->first, 0);
    EXPECT_EQ(t->last, 0);
    EXPECT_EQ(t->freeFirst, 1);
    EXPECT_EQ(t->freeLast, 9);
    EXPECT_EQ(t->full, 0u);
    EXPECT_EQ(t->hasText, 0u);
    EXPECT_TRUE(TableInvariantsHold(doc));
}

}  // namespace
