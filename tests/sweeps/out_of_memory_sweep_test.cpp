// Every allocation of every scenario fails in turn, alone and with every later one.
#include <gtest/gtest.h>

#include "support/fixture.h"
#include "sweeps/scenarios.h"
#include "sweeps/sweep.h"

namespace {

class OutOfMemorySweep : public annotest::LeakCheckedTest {
 protected:
    void SweepScenario(const sweep::Scenario &scenario) {
#if ANNO_HAVE_PLATFORM_CONTROLS
        const sweep::Figures f = sweep::Sweep(scenario, sweep::Fault::Allocation);
        RecordProperty("allocations", static_cast<int>(f.points));
        RecordProperty("runs", static_cast<int>(f.runs));
        std::printf("[ sweeps  ] %s: %llu allocations failed in %llu runs\n", scenario.name.c_str(),
                    static_cast<unsigned long long>(f.failedPairs.size()),
                    static_cast<unsigned long long>(f.runs));
        EXPECT_GT(f.points, 0u) << "the scenario allocates nothing";
#else
        (void)scenario;
#endif
    }
};

TEST_F(OutOfMemorySweep, StylesAndAnnotationsSurviveEveryFailedAllocation) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::StylesAndAnnotations());
}

TEST_F(OutOfMemorySweep, AnnotationTextSurvivesEveryFailedAllocation) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::AnnotationText());
}

TEST_F(OutOfMemorySweep, MappingSurvivesEveryFailedAllocation) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::Mapping());
}

TEST_F(OutOfMemorySweep, RangeSplittingSurvivesEveryFailedAllocation) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::RangeSplitting());
}

TEST_F(OutOfMemorySweep, CopyingAndBuildingSurviveEveryFailedAllocation) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::CopyingAndBuilding());
}

TEST_F(OutOfMemorySweep, LargeTableSurvivesEveryFailedAllocation) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::LargeTable());
}

}  // namespace
