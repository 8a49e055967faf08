// Walking whole documents in the tests of stepping, text reading and finding.
#ifndef ANNO_TESTS_WALKING_WALK_SUPPORT_H
#define ANNO_TESTS_WALKING_WALK_SUPPORT_H

#include <gtest/gtest.h>

#include <vector>

#include "support/fixture.h"

namespace walktest {

using Stepper = uint32_t (*)(DAHandle, const ANPos *, ANPos *);

// More steps than any test document has positions: a walk that reaches it cycles.
constexpr size_t kStepLimit = 5000;

// Every position from `start` on, `start` included, until the step gives 25. The
// result code that ended the walk goes to *endCode.
inline std::vector<ANPos> Walk(DAHandle doc, ANPos start, Stepper step,
                               uint32_t *endCode = nullptr) {
    std::vector<ANPos> walk{start};
    ANPos at = start;
    for (size_t i = 0; i < kStepLimit; ++i) {
        ANPos next{};
        const uint32_t rc = step(doc, &at, &next);
        if (rc != AN_OK) {
            if (endCode != nullptr) *endCode = rc;
            return walk;
        }
        walk.push_back(next);
        at = next;
    }
    ADD_FAILURE() << "the walk did not end within " << kStepLimit << " steps";
    return walk;
}

// The content walk a document should give: every item, text items as their
// characters (a text item without characters as the item itself).
inline std::vector<ANPos> ExpectedContent(DAHandle doc) {
    std::vector<ANPos> expected;
    for (const antk::ItemView &item : antk::items(doc)) {
        if (item.type == antk::kItemText && item.charCount > 0) {
            for (uint32_t c = 0; c < item.charCount; ++c) {
                expected.push_back(annotest::Pos(item.id, item.firstChar + c));
            }
        } else {
            expected.push_back(annotest::Pos(item.id));
        }
    }
    return expected;
}

// Each position sorts after the one before it.
inline ::testing::AssertionResult StrictlyAscending(const std::vector<ANPos> &walk) {
    for (size_t i = 1; i < walk.size(); ++i) {
        if (ANCompPos(&walk[i - 1], &walk[i]) != -1) {
            return ::testing::AssertionFailure()
                   << "step " << i << " goes from " << ::testing::PrintToString(walk[i - 1])
                   << " to " << ::testing::PrintToString(walk[i]);
        }
    }
    return ::testing::AssertionSuccess();
}

}  // namespace walktest

#endif  // ANNO_TESTS_WALKING_WALK_SUPPORT_H
