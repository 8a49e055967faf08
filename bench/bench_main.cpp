// The benchmark program: registers every benchmark, runs them with the console
// reporter, and closes with the ratios the performance goals are stated in, taken
// from this one run (medians when run with repetitions).
#include <benchmark/benchmark.h>

#include <cstdio>
#include <map>
#include <string>
#include <vector>

#include "bench_docs.h"
#include "bench_register.h"

namespace {

struct Result {
    double nsPerItem = 0;  // from items_per_second
    double realNs = 0;     // real time of one iteration
    double cpuNs = 0;      // CPU time of one iteration
    std::map<std::string, double> counters;
    bool median = false;
};

// The console reporter, keeping each benchmark's result (its median, when there
// are repetitions) for the summary.
class CollectingReporter : public benchmark::ConsoleReporter {
 public:
    // Plain text: the output goes to logs and into the README.
    CollectingReporter() : ConsoleReporter(OO_Tabular) {}

    void ReportRuns(const std::vector<Run> &runs) override {
        ConsoleReporter::ReportRuns(runs);
        for (const Run &run : runs) {
            if (run.error_occurred) continue;
            const bool median = run.run_type == Run::RT_Aggregate;
            if (median && run.aggregate_name != "median") continue;
            Result &result = results_[run.run_name.str()];
            if (result.median && !median) continue;
            result.median = median;
            result.counters.clear();
            for (const auto &[name, counter] : run.counters) result.counters[name] = counter.value;
            const auto items = run.counters.find("items_per_second");
            result.nsPerItem = items == run.counters.end() || items->second.value == 0
                                   ? 0
                                   : 1e9 / items->second.value;
            result.cpuNs = run.GetAdjustedCPUTime() *
                           benchmark::GetTimeUnitMultiplier(benchmark::kNanosecond) /
                           benchmark::GetTimeUnitMultiplier(run.time_unit);
            result.realNs = run.GetAdjustedRealTime() *
                            benchmark::GetTimeUnitMultiplier(benchmark::kNanosecond) /
                            benchmark::GetTimeUnitMultiplier(run.time_unit);
        }
    }

    const Result *Find(const std::string &name) const {
        const auto it = results_.find(name);
        return it == results_.end() ? nullptr : &it->second;
    }

 private:
    std::map<std::string, Result> results_;
};

void Ratio(const char *what, const Result *a, const Result *b, double Result::*field,
           const char *goal) {
    if (a == nullptr || b == nullptr || b->*field == 0) return;
    std::printf("  %-58s %8.2f   %s\n", what, a->*field / b->*field, goal);
}

void Summary(const CollectingReporter &r) {
    using annobench::AnnotationCounts;
    const std::string positions = std::to_string(annobench::DocPositions());
    const std::string doc = "/positions:" + positions;
    const std::string doc2 = "/positions:" + std::to_string(2 * annobench::DocPositions());
    std::printf("\nSummary (ratios within this run; medians when repeated)\n");
    std::printf(
        "  drawing walk, ns per position: walk | Boost.ICL | sorted vector | "
        "ICL/walk | vector/walk\n");
    for (const int64_t n : AnnotationCounts()) {
        const std::string suffix = doc + "/annos:" + std::to_string(n);
        const Result *walk = r.Find("DrawWalk" + suffix);
        const Result *icl = r.Find("PeerIcl" + suffix);
        const Result *vec = r.Find("PeerSortedVector" + suffix);
        if (walk == nullptr || icl == nullptr || vec == nullptr) continue;
        std::printf("    annos %6lld: %8.1f | %8.1f | %8.1f | %6.2f | %6.2f\n",
                    static_cast<long long>(n), walk->nsPerItem, icl->nsPerItem, vec->nsPerItem,
                    icl->nsPerItem / walk->nsPerItem, vec->nsPerItem / walk->nsPerItem);
    }
    const std::string largest = "/annos:" + std::to_string(AnnotationCounts().back());
    const std::string small = "/annos:" + std::to_string(AnnotationCounts()[1]);
    std::printf("  goals:\n");
    Ratio("walk per position, largest set / second-smallest set",
          r.Find("DrawWalk" + doc + largest), r.Find("DrawWalk" + doc + small), &Result::nsPerItem,
          "(goal <= 1.15)");
    const std::string half = "/annos:" + std::to_string(AnnotationCounts().back() / 2);
    Ratio("walk time, twice the document / the document (same density)",
          r.Find("DrawWalk" + doc2 + largest), r.Find("DrawWalk" + doc + half), &Result::cpuNs,
          "(goal 2 +- 15 %)");
    Ratio("Boost.ICL peer / walk, per position (largest set)", r.Find("PeerIcl" + doc + largest),
          r.Find("DrawWalk" + doc + largest), &Result::nsPerItem, "(goal >= 5)");
    Ratio("ANTrackAnno between change points / (ANCompPos + DAGetAnno)", r.Find("TrackBetween"),
          r.Find("CompPosGetAnno"), &Result::nsPerItem, "(goal <= 2)");
    const auto adds = annobench::AddCounts();
    Ratio("adding in document order, per entry: most / fewest entries",
          r.Find("AddAnno/document/entries:" + std::to_string(adds.back())),
          r.Find("AddAnno/document/entries:" + std::to_string(adds.front())), &Result::nsPerItem,
          "(goal <= 1.15)");
    if (const Result *walk = r.Find("DrawWalk" + doc + largest)) {
        const auto index = walk->counters.find("index_B_per_anno");
        const auto bytes = walk->counters.find("table_bytes");
        const auto entries = walk->counters.find("entries");
        if (index != walk->counters.end() && bytes != walk->counters.end() &&
            entries != walk->counters.end() && entries->second > 0) {
            std::printf("  %-58s %8.2f   (goal < 16)\n", "index bytes per annotation (largest set)",
                        index->second);
            std::printf("  %-58s %8.1f   (slot 104 + text + index)\n",
                        "table bytes per annotation (largest set)",
                        bytes->second / entries->second);
        }
    }
}

}  // namespace

int main(int argc, char **argv) {
    annobench::RegisterWalkBenchmarks();
    annobench::RegisterStoreBenchmarks();
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
    CollectingReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    Summary(reporter);
    benchmark::Shutdown();
    return 0;
}
