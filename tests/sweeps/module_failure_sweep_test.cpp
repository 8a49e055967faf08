// Every call into the data-access, chunker and content-access modules fails in turn,
// alone and with every later one: results as their contracts give (a module's code
// passed on where they pass it on), tables whole, nothing leaked, every document and
// content handle the library opened closed again.
#include <gtest/gtest.h>

#include <cstdio>

#include "support/fixture.h"
#include "sweeps/scenarios.h"
#include "sweeps/sweep.h"

namespace {

class ModuleFailureSweep : public annotest::LeakCheckedTest {
 protected:
    void SweepScenario(const sweep::Scenario &scenario) {
#if ANNO_HAVE_PLATFORM_CONTROLS
        const sweep::Figures f = sweep::Sweep(scenario, sweep::Fault::ModuleCall);
        RecordProperty("moduleCalls", static_cast<int>(f.points));
        RecordProperty("runs", static_cast<int>(f.runs));
        std::printf("[ sweeps  ] %s: %llu module calls failed in %llu runs\n",
                    scenario.name.c_str(), static_cast<unsigned long long>(f.failedPairs.size()),
                    static_cast<unsigned long long>(f.runs));
        EXPECT_GT(f.points, 0u) << "the scenario calls no module";
#else
        (void)scenario;
#endif
    }
};

TEST_F(ModuleFailureSweep, StylesAndAnnotationsSurviveEveryFailedModuleCall) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::StylesAndAnnotations());
}

TEST_F(ModuleFailureSweep, AnnotationTextSurvivesEveryFailedModuleCall) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::AnnotationText());
}

TEST_F(ModuleFailureSweep, MappingSurvivesEveryFailedModuleCall) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::Mapping());
}

TEST_F(ModuleFailureSweep, RangeSplittingSurvivesEveryFailedModuleCall) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::RangeSplitting());
}

TEST_F(ModuleFailureSweep, CopyingAndBuildingSurviveEveryFailedModuleCall) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    SweepScenario(sweep::CopyingAndBuilding());
}

}  // namespace
