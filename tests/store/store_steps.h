// Shared by the store's tests: every mutating step is followed by the table checks.
#ifndef ANNO_TESTS_STORE_STEPS_H
#define ANNO_TESTS_STORE_STEPS_H

#include "support/invariants.h"

// Runs an adding step, expects `code`, then checks the table (and, in the tests of
// adding, the layout of annotation text).
#define EXPECT_STEP(code, step)                                   \
    do {                                                          \
        EXPECT_EQ((step), (code)) << #step;                       \
        EXPECT_TRUE(annotest::TableInvariantsHold(doc)) << #step; \
        EXPECT_TRUE(annotest::TextLayoutHolds(doc)) << #step;     \
    } while (0)

#define ADD_OK(step) EXPECT_STEP(AN_OK, step)

#endif  // ANNO_TESTS_STORE_STEPS_H
