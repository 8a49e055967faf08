// What the benchmarks share: the sizes they run at, toolkit documents of a given
// number of positions, the annotation set laid over them, and the memory a
// document's annotation table holds.
#ifndef ANNO_BENCH_DOCS_H
#define ANNO_BENCH_DOCS_H

#include <benchmark/benchmark.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <unordered_map>
#include <vector>

#include "anno/anno.h"

namespace annobench {

// Smoke mode (ANNO_BENCH_SMOKE set and not "0"): small documents and tables, so
// that a CI run only checks that every benchmark still builds and runs.
bool Smoke();

// Positions of the drawing documents: one million, or 20,000 in smoke mode.
uint32_t DocPositions();

// Annotation counts of the drawing walk, and entry counts of adding.
std::vector<int64_t> AnnotationCounts();
std::vector<int64_t> AddCounts();

// One content item of a document, for turning positions into peer keys.
struct ItemPlace {
    uint32_t ordinal;    // walk ordinal of the item's first position
    uint32_t firstChar;  // text items: first character id
    bool text;
};

// A toolkit document with annotation state: paragraphs of one plain item and a
// text item of 99 characters (100 positions each), and a cut item after every
// 50th paragraph.
class Document {
 public:
    explicit Document(uint32_t positions);
    ~Document();
    Document(const Document &) = delete;
    Document &operator=(const Document &) = delete;

    DAHandle doc() const { return doc_; }
    // Every content position, in walk order.
    const std::vector<ANPos> &content() const { return content_; }
    // Frees the annotation state and makes a new, empty one.
    void Reset();
    // The peer's key of a position: 16 per content position, text units first.
    uint64_t Key(const ANPos &pos) const;

 private:
    DAHandle doc_ = nullptr;
    std::vector<ANPos> content_;
    std::unordered_map<uint32_t, ItemPlace> items_;
};

// One annotation of the benchmark set, over content ordinals [first, last].
struct Planned {
    uint16_t type;
    uint32_t first;
    uint32_t last;
};

// `count` annotations spread evenly over `positions` content positions: every type,
// a tenth of them type-5 text (and one in fifty a placeholder), ranges and
// highlights a few positions long.
std::vector<Planned> Plan(uint32_t count, uint32_t positions);

// Adds one planned annotation through ANAddAnno; returns its result.
uint32_t AddPlanned(const Document &doc, const Planned &anno, uint32_t tag);

// A document of `positions` positions carrying the set of `count` annotations,
// made once per process and kept.
Document &AnnotatedDocument(uint32_t positions, uint32_t count);

// What a document's annotation table holds, in bytes.
struct TableMemory {
    size_t table = 0;  // header and slots: capacity * sizeof(ANEntry) + header
    size_t texts = 0;  // text buffers of type-5 entries
    size_t index = 0;  // the lookup index kept beside the table
    uint32_t entries = 0;
    size_t Total() const { return table + texts + index; }
};
TableMemory MeasureTable(DAHandle doc);

// Adds the table's bytes as counters: table_bytes (all), index_bytes_per_anno.
void ReportTable(benchmark::State &state, DAHandle doc);

}  // namespace annobench

#endif  // ANNO_BENCH_DOCS_H
