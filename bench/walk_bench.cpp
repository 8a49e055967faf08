// Drawing: comparing positions, tracking between and at change points, the full
// drawing walk over a large document, and the peers that answer the same question
// per position (Boost.ICL's interval_map and a sweep over a sorted vector).
#include <benchmark/benchmark.h>

#include <algorithm>
#include <boost/icl/interval_map.hpp>
#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "anno/anno.h"
#include "anno/toolkit.h"
#include "bench_docs.h"
#include "bench_register.h"
#include "binding/instance.h"
#include "hosts/modules.h"
#include "store/table.h"
#include "support/track_model.h"

namespace annobench {

namespace {

const ANEntryTable *TableOf(DAHandle doc) {
    const auto *instance = static_cast<const ANInstance *>(antk::annoSlot(doc));
    return instance == nullptr ? nullptr : instance->entries;
}

// The positions a drawing walk visits, from the document's first position.
std::vector<ANPos> WalkPositions(DAHandle doc, const ANPos &first) {
    std::vector<ANPos> walk;
    ANPos pos = first;
    ANPos next{};
    do {
        walk.push_back(pos);
    } while (ANNextPos(doc, &pos, &next) == AN_OK && (pos = next, true));
    return walk;
}

// The document's annotations as peer keys, and the keys of the walk.
struct PeerData {
    struct Interval {
        uint64_t start;
        uint64_t end;
        uint32_t bit;
    };
    std::vector<Interval> intervals;  // sorted by start
    std::vector<uint64_t> walk;
    boost::icl::interval_map<uint64_t, std::set<uint32_t>> icl;
};

const PeerData &Peers(uint32_t positions, uint32_t count) {
    static std::map<std::pair<uint32_t, uint32_t>, std::unique_ptr<PeerData>> made;
    auto &slot = made[{positions, count}];
    if (slot) return *slot;
    slot = std::make_unique<PeerData>();
    PeerData &data = *slot;
    const Document &doc = AnnotatedDocument(positions, count);
    if (const ANEntryTable *table = TableOf(doc.doc())) {
        for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
            const ANEntry &entry = ANSlot(table, i);
            const uint64_t start = doc.Key(entry.record.start);
            const uint64_t end = doc.Key(entry.record.end);
            if (end <= start) continue;
            data.intervals.push_back({start, end, annotest::TrackBitOf(entry.type)});
        }
    }
    std::sort(
        data.intervals.begin(), data.intervals.end(),
        [](const PeerData::Interval &a, const PeerData::Interval &b) { return a.start < b.start; });
    for (uint32_t id = 0; id < data.intervals.size(); ++id) {
        const PeerData::Interval &iv = data.intervals[id];
        data.icl += std::make_pair(boost::icl::interval<uint64_t>::right_open(iv.start, iv.end),
                                   std::set<uint32_t>{id});
    }
    for (const ANPos &pos : WalkPositions(doc.doc(), doc.content().front())) {
        data.walk.push_back(doc.Key(pos));
    }
    return data;
}

void BM_CompPos(benchmark::State &state) {
    const Document &doc = AnnotatedDocument(DocPositions(), 0);
    const std::vector<ANPos> &content = doc.content();
    std::vector<ANPos> pairs;
    for (size_t i = 0; i < 1024; ++i) {
        ANPos p = content[(i * 7919) % content.size()];
        if (i % 3 == 0) {
            p.kind = ANPOS_ANNOTEXT;
            p.textIndex = static_cast<uint32_t>(i % 5);
        }
        pairs.push_back(p);
    }
    size_t i = 0;
    int32_t sum = 0;
    for (auto _ : state) {
        sum += ANCompPos(&pairs[i & 1023], &pairs[(i + 1) & 1023]);
        ++i;
    }
    benchmark::DoNotOptimize(sum);
    state.SetItemsProcessed(state.iterations());
}

// Positions in the gap before the first change point after `from`, with a track
// started at `from`.
struct Gap {
    std::vector<ANPos> positions;
    ANTrackInfo track{};
};

Gap GapAfter(const Document &doc, uint32_t fromOrdinal) {
    Gap gap;
    const ANPos from = doc.content()[fromOrdinal];
    ANStartAnnoTrack(doc.doc(), &from, &gap.track);
    ANTrackAnno(doc.doc(), &from, &gap.track);
    for (uint32_t o = fromOrdinal + 1; o < doc.content().size() && gap.positions.size() < 64; ++o) {
        const ANPos &p = doc.content()[o];
        if (ANCompPos(&p, &gap.track.nextChange) >= 0) break;
        gap.positions.push_back(p);
    }
    return gap;
}

uint32_t GapCount() { return Smoke() ? 100 : 1000; }

// ANTrackAnno at positions before the next change point: the cost a viewer pays at
// nearly every position it draws.
void BM_TrackBetween(benchmark::State &state) {
    const Document &doc = AnnotatedDocument(DocPositions(), GapCount());
    Gap gap = GapAfter(doc, static_cast<uint32_t>(doc.content().size() / 2));
    if (gap.positions.empty()) {
        state.SkipWithError("no gap between change points");
        return;
    }
    size_t i = 0;
    uint32_t bits = 0;
    for (auto _ : state) {
        bits |= ANTrackAnno(doc.doc(), &gap.positions[i], &gap.track);
        if (++i == gap.positions.size()) i = 0;
    }
    benchmark::DoNotOptimize(bits);
    state.SetItemsProcessed(state.iterations());
}

// What the between-change-points call is held against: a bare ANCompPos plus the
// toolkit's DAGetAnno.
void BM_CompPosGetAnno(benchmark::State &state) {
    const Document &doc = AnnotatedDocument(DocPositions(), GapCount());
    Gap gap = GapAfter(doc, static_cast<uint32_t>(doc.content().size() / 2));
    if (gap.positions.empty()) {
        state.SkipWithError("no gap between change points");
        return;
    }
    size_t i = 0;
    int32_t sum = 0;
    for (auto _ : state) {
        void *instance = nullptr;
        DAGetAnno(doc.doc(), &instance);
        benchmark::DoNotOptimize(instance);
        sum += ANCompPos(&gap.positions[i], &gap.track.nextChange);
        if (++i == gap.positions.size()) i = 0;
    }
    benchmark::DoNotOptimize(sum);
    state.SetItemsProcessed(state.iterations());
}

// ANTrackAnno at every change point (each start and end) of the annotation set.
void BM_TrackAtChange(benchmark::State &state, uint32_t count) {
    const Document &doc = AnnotatedDocument(DocPositions(), count);
    std::vector<ANPos> changes;
    if (const ANEntryTable *table = TableOf(doc.doc())) {
        for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
            changes.push_back(ANSlot(table, i).record.start);
            changes.push_back(ANSlot(table, i).record.end);
        }
    }
    std::sort(changes.begin(), changes.end(),
              [](const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b) < 0; });
    changes.erase(
        std::unique(changes.begin(), changes.end(),
                    [](const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b) == 0; }),
        changes.end());
    if (changes.empty()) {
        state.SkipWithError("no change points");
        return;
    }
    ANTrackInfo track{};
    size_t i = 0;
    uint32_t bits = 0;
    ANStartAnnoTrack(doc.doc(), &changes[0], &track);
    for (auto _ : state) {
        bits |= ANTrackAnno(doc.doc(), &changes[i], &track);
        if (++i == changes.size()) {
            state.PauseTiming();
            i = 0;
            track = ANTrackInfo{};
            ANStartAnnoTrack(doc.doc(), &changes[0], &track);
            state.ResumeTiming();
        }
    }
    benchmark::DoNotOptimize(bits);
    state.SetItemsProcessed(state.iterations());
    ReportTable(state, doc.doc());
}

// The drawing walk: ANNextPos from the first position to the last, ANTrackAnno at
// every position and ANGetAnnoText at every position of annotation text.
void BM_DrawWalk(benchmark::State &state, uint32_t positions, uint32_t count) {
    const Document &doc = AnnotatedDocument(positions, count);
    const DAHandle handle = doc.doc();
    uint64_t visited = 0;
    uint64_t textUnits = 0;
    uint32_t bits = 0;
    for (auto _ : state) {
        ANPos pos = doc.content().front();
        ANPos next{};
        ANTrackInfo track{};
        ANAnnoTextTrack text{};
        ANStartAnnoTrack(handle, &pos, &track);
        ANStartAnnoTextTrack(handle, &text);
        for (;;) {
            bits |= ANTrackAnno(handle, &pos, &track);
            if (pos.kind == ANPOS_ANNOTEXT) {
                uint16_t unit = 0;
                if (ANGetAnnoText(handle, &text, &pos, &unit) == AN_TYPE_TEXT) ++textUnits;
            }
            ++visited;
            if (ANNextPos(handle, &pos, &next) != AN_OK) break;
            pos = next;
        }
        ANEndAnnoTextTrack(handle, &text);
    }
    benchmark::DoNotOptimize(bits);
    state.SetItemsProcessed(static_cast<int64_t>(visited));
    state.counters["positions"] = static_cast<double>(visited / state.iterations());
    state.counters["text_units"] = static_cast<double>(textUnits / state.iterations());
    ReportTable(state, handle);
}

// The peer: the same annotations in a Boost.ICL interval_map of annotation sets,
// asked at every position of the same walk which annotations cover it.
void BM_PeerIcl(benchmark::State &state, uint32_t positions, uint32_t count) {
    const PeerData &data = Peers(positions, count);
    std::vector<uint32_t> bitOf;
    for (const auto &iv : data.intervals) bitOf.push_back(iv.bit);
    uint32_t bits = 0;
    for (auto _ : state) {
        for (const uint64_t key : data.walk) {
            const auto found = data.icl.find(key);
            if (found == data.icl.end()) continue;
            for (const uint32_t id : found->second) bits |= bitOf[id];
        }
    }
    benchmark::DoNotOptimize(bits);
    state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * data.walk.size()));
}

// The plain peer: a sweep along the intervals sorted by start, keeping the ones
// that cover the current position.
void BM_PeerSortedVector(benchmark::State &state, uint32_t positions, uint32_t count) {
    const PeerData &data = Peers(positions, count);
    uint32_t bits = 0;
    std::vector<uint32_t> active;
    for (auto _ : state) {
        size_t cursor = 0;
        active.clear();
        for (const uint64_t key : data.walk) {
            while (cursor < data.intervals.size() && data.intervals[cursor].start <= key) {
                active.push_back(static_cast<uint32_t>(cursor++));
            }
            uint32_t here = 0;
            for (size_t a = 0; a < active.size();) {
                const auto &iv = data.intervals[active[a]];
                if (iv.end <= key) {
                    active[a] = active.back();
                    active.pop_back();
                    continue;
                }
                here |= iv.bit;
                ++a;
            }
            bits |= here;
        }
    }
    benchmark::DoNotOptimize(bits);
    state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * data.walk.size()));
}

}  // namespace

void RegisterWalkBenchmarks() {
    benchmark::RegisterBenchmark("CompPos", BM_CompPos);
    benchmark::RegisterBenchmark("TrackBetween", BM_TrackBetween);
    benchmark::RegisterBenchmark("CompPosGetAnno", BM_CompPosGetAnno);
    const uint32_t changes = Smoke() ? 1000 : 10000;
    benchmark::RegisterBenchmark(("TrackAtChange/annos:" + std::to_string(changes)).c_str(),
                                 BM_TrackAtChange, changes);

    const uint32_t positions = DocPositions();
    const std::string doc = "/positions:" + std::to_string(positions);
    const std::string doc2 = "/positions:" + std::to_string(2 * positions);
    for (const int64_t n : AnnotationCounts()) {
        const auto count = static_cast<uint32_t>(n);
        const std::string suffix = "/annos:" + std::to_string(count);
        benchmark::RegisterBenchmark(("DrawWalk" + doc + suffix).c_str(), BM_DrawWalk, positions,
                                     count)
            ->Unit(benchmark::kMillisecond);
        benchmark::RegisterBenchmark(("PeerIcl" + doc + suffix).c_str(), BM_PeerIcl, positions,
                                     count)
            ->Unit(benchmark::kMillisecond);
        benchmark::RegisterBenchmark(("PeerSortedVector" + doc + suffix).c_str(),
                                     BM_PeerSortedVector, positions, count)
            ->Unit(benchmark::kMillisecond);
    }
    // Twice the document with the largest set, against the document with half of it:
    // at the same density the walk should take twice as long.
    const int64_t largest = AnnotationCounts().back();
    benchmark::RegisterBenchmark(
        ("DrawWalk" + doc + "/annos:" + std::to_string(largest / 2)).c_str(), BM_DrawWalk,
        positions, static_cast<uint32_t>(largest / 2))
        ->Unit(benchmark::kMillisecond);
    benchmark::RegisterBenchmark(("DrawWalk" + doc2 + "/annos:" + std::to_string(largest)).c_str(),
                                 BM_DrawWalk, 2 * positions, static_cast<uint32_t>(largest))
        ->Unit(benchmark::kMillisecond);
}

}  // namespace annobench
