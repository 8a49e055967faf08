#include "sweeps/sweep.h"

#include <algorithm>
#include <cstdio>
#include <sstream>

#include "anno/toolkit.h"
#include "store/table.h"
#include "support/fixture.h"
#include "support/invariants.h"
#include "tracking/text_track.h"

#include "hosts/platform.h"

namespace sweep {

bool Codes::contains(uint32_t code) const {
    return any_ || std::find(codes_.begin(), codes_.end(), code) != codes_.end();
}

Codes Codes::with(std::initializer_list<uint32_t> more) const {
    Codes c = *this;
    c.codes_.insert(c.codes_.end(), more.begin(), more.end());
    return c;
}

std::string Codes::str() const {
    if (any_) return "any";
    std::ostringstream out;
    out << "{";
    for (size_t i = 0; i < codes_.size(); ++i) out << (i == 0 ? "" : ", ") << codes_[i];
    out << "}";
    return out.str();
}

std::set<uint64_t> OwnedBlocks(const World &world) {
    std::set<uint64_t> owned;
    for (DAHandle doc : world.docs) {
        for (const annotest::Listed &e : annotest::ListedEntries(doc)) {
            if ((e.flags & ANENTRY_OWNS_USERDATA) != 0 && e.record.userData != 0) {
                owned.insert(e.record.userData);
            }
        }
    }
    return owned;
}

::testing::AssertionResult TextTrackHolds(const ANAnnoTextTrack &track) {
    const ANPos zero{};
    auto isZero = [&zero](const ANPos &p) {
        return p.itemId == zero.itemId && p.subItemId == zero.subItemId && p.kind == zero.kind &&
               p.textIndex == zero.textIndex;
    };
    const ANTextSegList *list = track.segs;
    if (list == nullptr) {
        if (isZero(track.firstPos) && isZero(track.lastPos)) return ::testing::AssertionSuccess();
        return ::testing::AssertionFailure() << "a track without a list caches a range";
    }
    const uint32_t capacity = list->segCapacity;
    if (capacity == 0 || capacity % ANTEXTSEG_GROWTH != 0) {
        return ::testing::AssertionFailure() << "segment capacity " << capacity;
    }
    const ANTextSeg *slots = ANTextSegs(list);
    std::vector<int> seen(capacity, 0);
    uint32_t used = 0;
    uint64_t units = 0;
    uint16_t before = AN_NONE;
    for (uint16_t i = list->segHead; i != AN_NONE; i = slots[i].next) {
        if (i >= capacity || seen[i] != 0) {
            return ::testing::AssertionFailure() << "used list meets slot " << i << " badly";
        }
        seen[i] = 1;
        if (slots[i].prev != before) {
            return ::testing::AssertionFailure()
                   << "used slot " << i << " has prev " << slots[i].prev << ", expected " << before;
        }
        const ANTextSeg &seg = slots[i];
        if (seg.segKind == ANTEXTSEG_UNIT) {
            if (seg.segLength != 1 || seg.segText != nullptr) {
                return ::testing::AssertionFailure() << "placeholder segment in slot " << i;
            }
        } else if (seg.segKind != ANTEXTSEG_TEXT ||
                   (seg.segLength != 0 && seg.segText == nullptr)) {
            return ::testing::AssertionFailure() << "text segment in slot " << i << " kind "
                                                 << seg.segKind << " length " << seg.segLength;
        }
        units += seg.segLength;
        before = i;
        ++used;
    }
    if (before != list->segTail) {
        return ::testing::AssertionFailure()
               << "used list ends at " << before << ", tail says " << list->segTail;
    }
    uint32_t free = 0;
    for (uint16_t i = list->segFree; i != AN_NONE; i = slots[i].next) {
        if (i >= capacity || seen[i] != 0) {
            return ::testing::AssertionFailure() << "free list meets slot " << i << " badly";
        }
        seen[i] = 2;
        ++free;
    }
    if (used + free != capacity || used != list->segCount) {
        return ::testing::AssertionFailure() << used << " used + " << free << " free slots, count "
                                             << list->segCount << ", capacity " << capacity;
    }
    if (used == 0) {
        if (isZero(track.firstPos) && isZero(track.lastPos)) return ::testing::AssertionSuccess();
        return ::testing::AssertionFailure() << "an empty cache keeps a range";
    }
    const ANPos &f = track.firstPos;
    const ANPos &l = track.lastPos;
    if (f.kind != ANPOS_ANNOTEXT || f.textIndex != 0 || l.kind != ANPOS_ANNOTEXT ||
        l.itemId != f.itemId || l.subItemId != f.subItemId ||
        l.textIndex != static_cast<uint32_t>(units - 1)) {
        return ::testing::AssertionFailure()
               << "cached range " << ::testing::PrintToString(f) << " to "
               << ::testing::PrintToString(l) << " for " << units << " units";
    }
    return ::testing::AssertionSuccess();
}

uint64_t World::NewBlock(size_t bytes) {
    void *block = HeapAlloc(GetProcessHeap(), HEAP_ZERO_MEMORY, bytes);
    const auto value = static_cast<uint64_t>(reinterpret_cast<uintptr_t>(block));
    blocks.push_back(value);
    return value;
}

#if ANNO_HAVE_PLATFORM_CONTROLS

namespace {

// The process totals, printed when the test program ends.
struct Totals {
    uint64_t scenarios = 0;
    uint64_t runs = 0;
    std::set<std::string> allocationPairs;
    std::set<std::string> callPairs;
    std::map<std::string, uint64_t> perFunction;
};

Totals &TheTotals() {
    static Totals totals;
    return totals;
}

class TotalsPrinter : public ::testing::Environment {
 public:
    void TearDown() override {
        const Totals &t = TheTotals();
        if (t.scenarios == 0) return;
        std::printf(
            "[ sweeps  ] %llu scenario sweeps, %llu failure runs: %zu allocation points "
            "failed (scenario, step, index in step), %zu module calls failed\n",
            static_cast<unsigned long long>(t.scenarios), static_cast<unsigned long long>(t.runs),
            t.allocationPairs.size(), t.callPairs.size());
        if (!t.perFunction.empty()) {
            std::printf("[ sweeps  ] module calls failed by function:");
            for (const auto &[fn, count] : t.perFunction) {
                std::printf(" %s %llu", fn.c_str(), static_cast<unsigned long long>(count));
            }
            std::printf("\n");
        }
    }
};

[[maybe_unused]] ::testing::Environment *const kTotalsPrinter =
    ::testing::AddGlobalTestEnvironment(new TotalsPrinter);

std::map<std::string, uint64_t> CallsByFunction() {
    std::map<std::string, uint64_t> out;
    for (int f = 0; f < static_cast<int>(antk::Fn::Count); ++f) {
        const auto fn = static_cast<antk::Fn>(f);
        const uint64_t n = antk::calls(fn);
        if (n != 0) out[antk::fnName(fn)] = n;
    }
    return out;
}

struct RunControl {
    Failure failure;
    const Reference *ref = nullptr;
    Reference *record = nullptr;  // filled by the reference run
    const StepProbe *probe = nullptr;
    size_t probeStep = 0;  // without a failure: the step after which to probe
};

std::string Describe(const Scenario &s, const Failure &f) {
    std::ostringstream out;
    out << "scenario '" << s.name << "'";
    if (f.n != 0) {
        out << ", " << (f.fault == Fault::Allocation ? "allocation " : "module call ") << f.n;
        if (!f.function.empty()) out << " of " << f.function;
        out << (f.persistent ? " and every later one" : " alone") << " failing";
    }
    return out.str();
}

antk::Fn FunctionNamed(const std::string &name) {
    for (int f = 0; f < static_cast<int>(antk::Fn::Count); ++f) {
        if (name == antk::fnName(static_cast<antk::Fn>(f))) return static_cast<antk::Fn>(f);
    }
    return antk::Fn::Count;
}

void CheckWorld(const World &w, const std::string &where) {
    for (size_t d = 0; d < w.docs.size(); ++d) {
        EXPECT_TRUE(annotest::TableInvariantsHold(w.docs[d])) << where << ", document " << d;
    }
    for (size_t t = 0; t < w.texts.size(); ++t) {
        EXPECT_TRUE(TextTrackHolds(w.texts[t])) << where << ", text track " << t;
    }
}

// Ends what the caller owns, frees the annotation state and the documents, and checks
// that nothing is left.
void TearDownWorld(World &w, int64_t heapAtStart, int64_t globalAtStart, const std::string &where) {
    anwin::clearFailures();
    antk::clearFailures();
    for (ANAnnoTextTrack &t : w.texts) EXPECT_EQ(ANEndAnnoTextTrack(nullptr, &t), AN_OK);
    // Blocks no entry owns are the caller's again (never taken, or their entry was
    // cleared); the others are freed by ANClearUserData.
    const std::set<uint64_t> owned = OwnedBlocks(w);
    for (uint64_t block : w.blocks) {
        if (owned.count(block) == 0 && w.freedBlocks.count(block) == 0) {
            HeapFree(GetProcessHeap(), 0, reinterpret_cast<void *>(static_cast<uintptr_t>(block)));
        }
    }
    w.blocks.clear();
    for (DAHandle doc : w.docs) EXPECT_EQ(ANClearUserData(doc), AN_OK) << where;
    for (DAHandle doc : w.docs) EXPECT_EQ(ANDeInit(doc), AN_OK) << where;
    EXPECT_EQ(antk::openSecondaryDocuments(), 0) << where << ": content documents left open";
    EXPECT_EQ(antk::openContents(), 0) << where << ": content handles left open";
    for (DAHandle doc : w.docs) antk::destroyDocument(doc);
    w.docs.clear();
    if (w.globalStyles != nullptr) {
        EXPECT_EQ(ANDeInitGlobalHiliteStyles(w.globalStyles), AN_OK);
    }
    w.globalStyles = nullptr;
    EXPECT_EQ(anwin::heapBlocks(), heapAtStart) << where << ": process-heap blocks leaked";
    EXPECT_EQ(anwin::globalBlocks(), globalAtStart) << where << ": global blocks leaked";
    EXPECT_EQ(anwin::globalLocks(), 0) << where << ": global blocks left locked";
}

void RunOnce(const Scenario &s, const RunControl &ctl) {
    const Failure &f = ctl.failure;
    const std::string where = Describe(s, f);
    const int64_t heapAtStart = anwin::heapBlocks();
    const int64_t globalAtStart = anwin::globalBlocks();
    World w;
    s.prepare(w);

    anwin::clearFailures();
    antk::clearFailures();
    anwin::resetCounters();
    antk::resetCalls();
    size_t hitStep = ctl.probe != nullptr ? ctl.probeStep : s.steps.size();
    if (f.n != 0) {
        uint64_t within = 0;
        hitStep = StepOf(*ctl.ref, f, &within);
        if (f.fault == Fault::Allocation) {
            anwin::failAllocation(f.n, f.persistent);
        } else if (f.function.empty()) {
            antk::failAnyCall(f.n, kModuleCode, f.persistent);
        } else {
            antk::failCall(FunctionNamed(f.function), f.n, kModuleCode, f.persistent);
        }
    }
    // A module's code may come back only from the calls that pass it on, and only
    // when a function whose code is passed on failed.
    const bool moduleCodeAllowed =
        f.fault == Fault::ModuleCall && (f.function.empty() || PassesOnItsCode(f.function));

    for (size_t i = 0; i < s.steps.size(); ++i) {
        const Step &step = s.steps[i];
        const std::string at = where + ", step " + std::to_string(i) + " '" + step.name + "'";
        const uint64_t allocationsBefore = anwin::allocations();
        const uint64_t callsBefore = antk::totalCalls();
        const std::map<std::string, uint64_t> fnBefore =
            ctl.record != nullptr ? CallsByFunction() : std::map<std::string, uint64_t>{};
        w.stepAllocations = allocationsBefore;

        const uint32_t rc = step.act(w);

        if (ctl.record != nullptr) {
            Reference &r = *ctl.record;
            r.results.push_back(rc);
            r.allocationsBefore.push_back(allocationsBefore);
            r.callsBefore.push_back(callsBefore);
            std::map<std::string, uint64_t> fnAfter = CallsByFunction();
            for (auto &[fn, count] : fnAfter) count -= fnBefore.count(fn) ? fnBefore.at(fn) : 0;
            r.perStepFunction.push_back(fnAfter);
            EXPECT_TRUE(step.normal.contains(rc))
                << at << ": the unfailed run gives " << rc << ", not " << step.normal.str();
        } else if (i < hitStep) {
            EXPECT_EQ(rc, ctl.ref->results[i]) << at << ": before any failure";
        } else {
            const bool ok = rc == ctl.ref->results[i] ||
                            ((rc != kModuleCode || moduleCodeAllowed) && step.codes.contains(rc));
            EXPECT_TRUE(ok) << at << ": gives " << rc << "; may give " << ctl.ref->results[i]
                            << " or " << step.codes.str()
                            << (moduleCodeAllowed ? "" : " without the module's code");
            if (i == hitStep && f.n != 0 && f.fault == Fault::Allocation &&
                !step.outOfMemory.empty()) {
                EXPECT_TRUE(step.outOfMemory.contains(rc))
                    << at << ": out of memory gives " << rc << "; expected "
                    << step.outOfMemory.str();
            }
            if (i == hitStep && ctl.probe != nullptr && *ctl.probe) {
                w.stepAllocations = anwin::allocations() - allocationsBefore;
                (*ctl.probe)(w, i, rc);
            }
        }
        CheckWorld(w, at);
    }
    if (ctl.record != nullptr) {
        ctl.record->allocationsBefore.push_back(anwin::allocations());
        ctl.record->callsBefore.push_back(antk::totalCalls());
        ctl.record->allocations = anwin::allocations();
        ctl.record->calls = antk::totalCalls();
        ctl.record->perFunction = CallsByFunction();
    }
    TearDownWorld(w, heapAtStart, globalAtStart, where);
}

}  // namespace

bool PassesOnItsCode(const std::string &function) {
    return function == "DAGetAnno" || function == "DARetrieveDocHandle" ||
           function == "DALockModuleData" || function == "DAGetHChunker";
}

size_t StepOf(const Reference &ref, const Failure &failure, uint64_t *within) {
    std::vector<uint64_t> before;
    if (failure.fault == Fault::Allocation) {
        before = ref.allocationsBefore;
    } else if (failure.function.empty()) {
        before = ref.callsBefore;
    } else {
        uint64_t sum = 0;
        for (const auto &step : ref.perStepFunction) {
            before.push_back(sum);
            const auto it = step.find(failure.function);
            if (it != step.end()) sum += it->second;
        }
        before.push_back(sum);
    }
    for (size_t i = 0; i + 1 < before.size(); ++i) {
        if (before[i + 1] >= failure.n) {
            *within = failure.n - before[i];
            return i;
        }
    }
    *within = 0;
    return before.empty() ? 0 : before.size() - 1;
}

Reference RunReference(const Scenario &scenario) {
    Reference ref;
    RunControl ctl;
    ctl.record = &ref;
    RunOnce(scenario, ctl);
    return ref;
}

void RunWithFailure(const Scenario &scenario, const Reference &ref, const Failure &failure,
                    const StepProbe &probe) {
    RunControl ctl;
    ctl.failure = failure;
    ctl.ref = &ref;
    ctl.probe = &probe;
    RunOnce(scenario, ctl);
}

void RunAndProbe(const Scenario &scenario, const Reference &ref, size_t step,
                 const StepProbe &probe) {
    RunControl ctl;
    ctl.ref = &ref;
    ctl.probe = &probe;
    ctl.probeStep = step;
    RunOnce(scenario, ctl);
}

Figures Sweep(const Scenario &scenario, Fault fault) {
    Figures figures;
    const Reference ref = RunReference(scenario);
    if (::testing::Test::HasFailure()) return figures;
    figures.points = fault == Fault::Allocation ? ref.allocations : ref.calls;

    // Each failure alone: allocations by their number; module calls function by
    // function, so that the function whose code comes back is known.
    std::vector<Failure> failures;
    if (fault == Fault::Allocation) {
        for (uint64_t n = 1; n <= ref.allocations; ++n) failures.push_back({fault, n, false, ""});
    } else {
        for (const auto &[fn, count] : ref.perFunction) {
            for (uint64_t k = 1; k <= count; ++k) failures.push_back({fault, k, false, fn});
        }
    }
    // Then each with every later one, over all functions.
    for (uint64_t n = 1; n <= figures.points; ++n) failures.push_back({fault, n, true, ""});

    for (const Failure &failure : failures) {
        RunWithFailure(scenario, ref, failure);
        ++figures.runs;
        // One broken run tells enough; thousands of repeats would bury it.
        if (::testing::Test::HasFailure()) return figures;
        if (failure.persistent) continue;
        uint64_t within = 0;
        const size_t step = StepOf(ref, failure, &within);
        figures.failedPairs.insert(scenario.steps[step].name + " #" + std::to_string(step) + " " +
                                   failure.function + "/" + std::to_string(within));
    }
    if (fault == Fault::ModuleCall) figures.perFunction = ref.perFunction;

    Totals &t = TheTotals();
    ++t.scenarios;
    t.runs += figures.runs;
    for (const std::string &pair : figures.failedPairs) {
        (fault == Fault::Allocation ? t.allocationPairs : t.callPairs)
            .insert(scenario.name + ": " + pair);
    }
    for (const auto &[fn, count] : figures.perFunction) t.perFunction[fn] += count;
    return figures;
}

#endif  // ANNO_HAVE_PLATFORM_CONTROLS

}  // namespace sweep
