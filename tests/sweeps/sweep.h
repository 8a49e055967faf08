// Failure sweeps over whole scenarios: a scenario is a fixed sequence of library calls
// on documents built with the toolkit. It runs once as it is, to record what every
// step returns and how many allocations and module calls it makes; then once for
// each of those allocations (or module calls) with that one failing, and once with
// every one from it on failing. Every run checks, after every step, that the result
// is one the call may give, that the tables keep their rules and that text tracks
// stay whole; and, after the documents' annotation state is gone and the caller's
// blocks are given back, that no heap or global-memory block and no opened document
// or content is left.
#ifndef ANNO_TESTS_SWEEPS_SWEEP_H
#define ANNO_TESTS_SWEEPS_SWEEP_H

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <functional>
#include <initializer_list>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "anno/anno.h"
#include "support/add_helpers.h"

namespace sweep {

// The code every injected module failure carries: no code of the library's own, so
// a result equal to it was passed on from a module.
constexpr uint32_t kModuleCode = 0x4D00;

// A set of results a call may give.
class Codes {
 public:
    Codes() = default;
    Codes(std::initializer_list<uint32_t> codes) : codes_(codes) {}
    static Codes Any() {
        Codes c;
        c.any_ = true;
        return c;
    }
    bool any() const { return any_; }
    bool empty() const { return !any_ && codes_.empty(); }
    bool contains(uint32_t code) const;
    Codes with(std::initializer_list<uint32_t> more) const;
    std::string str() const;

 private:
    std::vector<uint32_t> codes_;
    bool any_ = false;
};

// What one run of a scenario owns besides the library's own state.
struct World {
    std::vector<DAHandle> docs;  // made by the scenario's prepare; destroyed by the runner
    ANStyleTable *globalStyles = nullptr;
    std::array<ANAnnoTextTrack, 2> texts{};
    std::array<ANTrackInfo, 2> tracks{};
    // Caller blocks handed over as userData (process heap), by the order they were
    // made. At the end the runner frees those that no entry owns and the library has
    // not freed, and lets ANClearUserData free the others.
    std::vector<uint64_t> blocks;
    std::set<uint64_t> freedBlocks;       // freed by an ANClearUserData step
    annotest::Notifications notes;        // the callback every document is given
    std::map<std::string, uint32_t> ids;  // item ids the scenario names
    // Allocation attempts and module calls made so far in the step that runs.
    uint64_t stepAllocations = 0;

    DAHandle doc(size_t i) const { return docs.at(i); }
    uint32_t id(const std::string &name) const { return ids.at(name); }
    // A caller block of `bytes` from the process heap, made before any failure is armed.
    uint64_t NewBlock(size_t bytes = 16);
};

using Act = std::function<uint32_t(World &)>;

// One library call (or one walk that checks its own calls inside) of a scenario.
struct Step {
    std::string name;
    Act act;
    // Everything the call may give once earlier steps failed or a failure hits it:
    // success results, the codes its contract gives for a missing state, for memory,
    // and kModuleCode where a module's code is passed on. Any() for walks.
    Codes codes;
    // What it may give when an allocation inside it fails (the allocation sweep
    // checks this in the step the failure hits); empty when `codes` is all it knows.
    Codes outOfMemory;
    // What it gives in the unfailed run.
    Codes normal = Codes{AN_OK};
};

// The step, giving `codes` when an allocation inside it fails.
inline Step OnOutOfMemory(Step step, Codes codes) {
    step.outOfMemory = std::move(codes);
    return step;
}

// The step, giving `normal` in the unfailed run.
inline Step Expect(Step step, Codes normal) {
    step.normal = std::move(normal);
    return step;
}

struct Scenario {
    std::string name;
    // Builds the documents (and caller blocks); calls nothing of the library.
    std::function<void(World &)> prepare;
    std::vector<Step> steps;
};

// Which failures a sweep injects.
enum class Fault { Allocation, ModuleCall };

// The figures of one sweep of one scenario.
struct Figures {
    uint64_t points = 0;  // allocations, or module calls, of the unfailed run
    uint64_t runs = 0;
    std::set<std::string> failedPairs;            // "step/index within the step"
    std::map<std::string, uint64_t> perFunction;  // module calls failed, by function
};

// The reference run: what each step returned and how many allocations and module
// calls each made (per module function too).
struct Reference {
    std::vector<uint32_t> results;
    std::vector<uint64_t> allocationsBefore;  // cumulative, before each step
    std::vector<uint64_t> callsBefore;
    uint64_t allocations = 0;
    uint64_t calls = 0;
    std::map<std::string, uint64_t> perFunction;
    std::vector<std::map<std::string, uint64_t>> perStepFunction;
};

// Runs the scenario without failures.
Reference RunReference(const Scenario &scenario);

// One failure to inject: the n-th allocation, or the n-th module call (of `function`
// only, or of any function when it is empty), alone or with every later one.
struct Failure {
    Fault fault = Fault::Allocation;
    uint64_t n = 0;  // 1-based; 0 injects nothing
    bool persistent = false;
    std::string function;
};

// Runs the scenario once with `failure`; checks everything. `probe` (optional) is
// called with the world after the step that holds the failure, and its result.
using StepProbe = std::function<void(const World &, size_t step, uint32_t rc)>;
void RunWithFailure(const Scenario &scenario, const Reference &ref, const Failure &failure,
                    const StepProbe &probe = nullptr);

// Runs the scenario without failures and calls `probe` after step `step`.
void RunAndProbe(const Scenario &scenario, const Reference &ref, size_t step,
                 const StepProbe &probe);

// The whole sweep of one scenario for `fault`: every allocation, or every module call,
// failing alone, then every one failing with all that follow it. Returns its figures
// and adds them to the process totals printed at exit.
Figures Sweep(const Scenario &scenario, Fault fault);

// The step of the reference run that holds the failure (0-based), and the failure's
// index within that step.
size_t StepOf(const Reference &ref, const Failure &failure, uint64_t *within);

// Module functions whose failure code a library call may pass on as its result.
bool PassesOnItsCode(const std::string &function);

// The userData values held by entries that own them (ANClearUserData would free them).
std::set<uint64_t> OwnedBlocks(const World &world);

// Checks an annotation text track's segment list: both lists whole, covering every
// slot once, the count and the cached range agreeing with the used segments.
::testing::AssertionResult TextTrackHolds(const ANAnnoTextTrack &track);

}  // namespace sweep

#endif  // ANNO_TESTS_SWEEPS_SWEEP_H
