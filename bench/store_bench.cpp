// The store and the queries: adding in document order, in reverse and at random,
// clearing, finding, position mapping in a cached and an uncached chunk, and adding
// one long range over a document that carries many ranges.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "anno/anno.h"
#include "bench_docs.h"
#include "bench_register.h"

namespace annobench {

namespace {

enum class Order { Document, Reverse, Random };

const char *OrderName(Order order) {
    switch (order) {
        case Order::Document:
            return "document";
        case Order::Reverse:
            return "reverse";
        default:
            return "random";
    }
}

// The document the adding benchmarks fill and empty again; no other benchmark
// relies on what it carries.
Document &ScratchDocument() {
    static Document doc(DocPositions());
    return doc;
}

std::vector<Planned> Ordered(uint32_t count, uint32_t positions, Order order) {
    std::vector<Planned> plan = Plan(count, positions);
    if (order == Order::Reverse) std::reverse(plan.begin(), plan.end());
    if (order == Order::Random) {
        std::mt19937 random(12345);
        std::shuffle(plan.begin(), plan.end(), random);
    }
    return plan;
}

void AddAll(const Document &doc, const std::vector<Planned> &plan) {
    uint32_t tag = 1;
    for (const Planned &anno : plan) AddPlanned(doc, anno, tag++);
}

// Positions over which `count` annotations are spread at the same density whatever
// their number (one per 15 positions, as 64,000 on the million), so that a larger
// table is not also one whose neighbouring annotations share the toolkit's data.
uint32_t SameDensity(const Document &doc, uint32_t count) {
    const auto all = static_cast<uint32_t>(doc.content().size());
    return count < all / 15 ? count * 15 : all;
}

// ANAddAnno of `count` annotations of every type into an empty document.
void BM_AddAnno(benchmark::State &state, Order order, uint32_t count) {
    Document &doc = ScratchDocument();
    const std::vector<Planned> plan = Ordered(count, SameDensity(doc, count), order);
    for (auto _ : state) {
        state.PauseTiming();
        doc.Reset();
        state.ResumeTiming();
        AddAll(doc, plan);
    }
    state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * plan.size()));
    ReportTable(state, doc.doc());
    doc.Reset();
}

// ANClearAnnos removing every entry of a full table.
void BM_ClearAnnos(benchmark::State &state, uint32_t count) {
    Document &doc = ScratchDocument();
    const std::vector<Planned> plan =
        Ordered(count, static_cast<uint32_t>(doc.content().size()), Order::Document);
    for (auto _ : state) {
        state.PauseTiming();
        doc.Reset();
        AddAll(doc, plan);
        state.ResumeTiming();
        ANClearAnnos(doc.doc(), 0, 0);
    }
    state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * plan.size()));
    doc.Reset();
}

// ANFindAnno for the first annotation covering positions spread over the document.
void BM_FindAnno(benchmark::State &state, uint32_t count) {
    const Document &doc = AnnotatedDocument(DocPositions(), count);
    std::vector<ANPos> keys;
    std::mt19937 random(777);
    std::uniform_int_distribution<size_t> pick(0, doc.content().size() - 1);
    for (int i = 0; i < 1024; ++i) keys.push_back(doc.content()[pick(random)]);
    size_t i = 0;
    uint32_t found = 0;
    for (auto _ : state) {
        ANFindRecord find{};
        find.size = ANFINDRECORD_SIZE;
        find.mode = ANFIND_AT | ANFIND_MASK;
        find.key = keys[i++ & 1023];
        found += ANFindAnno(doc.doc(), 0, &find) == AN_OK ? 1 : 0;
    }
    benchmark::DoNotOptimize(found);
    state.SetItemsProcessed(state.iterations());
}

// ANMapPosition from a position to its character ordinal: always in one chunk,
// whose map stays cached, or in turn in three chunks, so that every call makes a
// map (two are kept).
void BM_MapPosition(benchmark::State &state, bool cached) {
    const Document &doc = AnnotatedDocument(DocPositions(), 0);
    std::vector<ANPos> chars;
    uint32_t chunk = UINT32_MAX;
    for (const ANPos &pos : doc.content()) {
        if (pos.subItemId == ANPOS_NOSUBITEM || pos.itemId >> 16 == chunk) continue;
        chunk = pos.itemId >> 16;
        chars.push_back(pos);
        if (chars.size() == 3) break;
    }
    if (chars.size() < 3) {
        state.SkipWithError("the document has fewer than three chunks");
        return;
    }
    size_t i = 0;
    uint32_t sum = 0;
    for (auto _ : state) {
        ANMapRecord map{};
        map.size = ANMAPRECORD_SIZE;
        map.flags = ANMAP_POS_TO_ORDINAL;
        map.pos = chars[cached ? 0 : i++ % 3];
        if (ANMapPosition(doc.doc(), &map) == AN_OK) sum += map.ordinal;
    }
    benchmark::DoNotOptimize(sum);
    state.SetItemsProcessed(state.iterations());
}

// Adding one range annotation of `span` positions in the middle of a document that
// carries `existing` short ranges: trimming, cutting and inserting its pieces.
void BM_AddLongRange(benchmark::State &state, uint32_t existing, uint32_t span) {
    Document &doc = ScratchDocument();
    const auto positions = static_cast<uint32_t>(doc.content().size());
    std::vector<Planned> ranges;
    const uint32_t spacing = positions / existing;
    for (uint32_t i = 0; i < existing; ++i) {
        ranges.push_back(Planned{AN_TYPE_RANGE, i * spacing + 3, i * spacing + 3 + spacing / 4});
    }
    const uint32_t from = positions / 2 - span / 2;
    const Planned range{AN_TYPE_RANGE, from, from + span};
    for (auto _ : state) {
        state.PauseTiming();
        doc.Reset();
        AddAll(doc, ranges);
        state.ResumeTiming();
        AddPlanned(doc, range, 0x4000);
    }
    state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * span));
    ReportTable(state, doc.doc());
    doc.Reset();
}

}  // namespace

void RegisterStoreBenchmarks() {
    for (const Order order : {Order::Document, Order::Reverse, Order::Random}) {
        for (const int64_t n : AddCounts()) {
            const auto count = static_cast<uint32_t>(n);
            const std::string name =
                std::string("AddAnno/") + OrderName(order) + "/entries:" + std::to_string(count);
            benchmark::RegisterBenchmark(name.c_str(), BM_AddAnno, order, count)
                ->Unit(benchmark::kMillisecond);
        }
    }
    for (const int64_t n : {AddCounts().front(), AddCounts().back()}) {
        const auto count = static_cast<uint32_t>(n);
        benchmark::RegisterBenchmark(("ClearAnnos/entries:" + std::to_string(count)).c_str(),
                                     BM_ClearAnnos, count)
            ->Unit(benchmark::kMicrosecond);
    }
    for (const int64_t n : AnnotationCounts()) {
        if (n == 0) continue;
        const auto count = static_cast<uint32_t>(n);
        benchmark::RegisterBenchmark(("FindAnno/annos:" + std::to_string(count)).c_str(),
                                     BM_FindAnno, count);
    }
    benchmark::RegisterBenchmark("MapPosition/cached", BM_MapPosition, true);
    benchmark::RegisterBenchmark("MapPosition/uncached", BM_MapPosition, false)
        ->Unit(benchmark::kMicrosecond);
    const uint32_t existing = Smoke() ? 100 : 5000;
    const uint32_t span = Smoke() ? 5000 : 100000;
    benchmark::RegisterBenchmark(
        ("AddLongRange/existing:" + std::to_string(existing) + "/span:" + std::to_string(span))
            .c_str(),
        BM_AddLongRange, existing, span)
        ->Unit(benchmark::kMillisecond);
}

}  // namespace annobench
