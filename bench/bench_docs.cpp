#include "bench_docs.h"

#include <cstdlib>
#include <map>
#include <string>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "store/index.h"
#include "store/table.h"

namespace annobench {

namespace {

constexpr uint32_t kCharsPerParagraph = 99;
constexpr uint32_t kPositionsPerParagraph = kCharsPerParagraph + 1;
constexpr uint32_t kParagraphsPerCut = 50;
constexpr uint32_t kKeysPerPosition = 16;  // annotation text units, then the content
constexpr uint32_t kRangeLength = 8;       // positions of a highlight or range
constexpr uint32_t kItemsPerChunk = 100;   // about 5,000 positions per chunk
constexpr uint32_t kAllocateStart = 1;     // first planned ordinal of each slot

const char16_t kNote[] = u"note";

}  // namespace

bool Smoke() {
    const char *smoke = std::getenv("ANNO_BENCH_SMOKE");
    return smoke != nullptr && std::string(smoke) != "0";
}

uint32_t DocPositions() { return Smoke() ? 20'000 : 1'000'000; }

std::vector<int64_t> AnnotationCounts() {
    if (Smoke()) return {0, 100, 1000};
    return {0, 1000, 10000, 60000};
}

std::vector<int64_t> AddCounts() {
    if (Smoke()) return {100, 400};
    return {1000, 4000, 16000, 64000};
}

Document::Document(uint32_t positions) {
    antk::DocumentBuilder builder(kItemsPerChunk);
    std::u16string chars;
    for (uint32_t i = 0; i < kCharsPerParagraph; ++i) {
        chars.push_back(static_cast<char16_t>(u'a' + i % 26));
    }
    uint32_t made = 0;
    uint32_t paragraphs = 0;
    std::vector<std::pair<uint32_t, bool>> order;  // item id, text item
    while (made < positions) {
        order.emplace_back(builder.item(antk::kItemParagraph), false);
        order.emplace_back(builder.textItem(std::u16string_view(chars)), true);
        made += kPositionsPerParagraph;
        if (++paragraphs % kParagraphsPerCut == 0) {
            order.emplace_back(builder.cutItem(), false);
            ++made;
        }
    }
    content_.reserve(made);
    for (const auto &[id, text] : order) {
        ItemPlace place{static_cast<uint32_t>(content_.size()), 0, text};
        if (text) {
            const std::vector<uint32_t> ids = builder.charIds(id);
            place.firstChar = ids.front();
            for (uint32_t c : ids) content_.push_back(ANPos{id, c, 0, 0});
        } else {
            content_.push_back(ANPos{id, ANPOS_NOSUBITEM, 0, 0});
        }
        items_.emplace(id, place);
    }
    doc_ = builder.build();
    ANInit(doc_, nullptr, nullptr, nullptr);
}

Document::~Document() {
    ANDeInit(doc_);
    antk::destroyDocument(doc_);
}

void Document::Reset() {
    ANDeInit(doc_);
    ANInit(doc_, nullptr, nullptr, nullptr);
}

uint64_t Document::Key(const ANPos &pos) const {
    const auto it = items_.find(pos.itemId);
    if (it == items_.end()) return UINT64_MAX;
    const ItemPlace &place = it->second;
    uint64_t ordinal = place.ordinal;
    if (place.text && pos.subItemId != ANPOS_NOSUBITEM) ordinal += pos.subItemId - place.firstChar;
    const uint64_t base = ordinal * kKeysPerPosition;
    if (pos.kind == ANPOS_ANNOTEXT) {
        return base + (pos.textIndex < kKeysPerPosition - 1 ? pos.textIndex : kKeysPerPosition - 2);
    }
    return base + kKeysPerPosition - 1;
}

std::vector<Planned> Plan(uint32_t count, uint32_t positions) {
    std::vector<Planned> plan;
    if (count == 0) return plan;
    plan.reserve(count);
    const uint32_t spacing = positions / count;
    const uint32_t length = spacing / 2 < kRangeLength ? spacing / 2 : kRangeLength;
    // Types other than text, in turn.
    static const uint16_t kOthers[] = {AN_TYPE_HILITE, AN_TYPE_POINT,  AN_TYPE_RANGE,
                                       AN_TYPE_VALUE,  AN_TYPE_HILITE, AN_TYPE_CUTMARK,
                                       AN_TYPE_RANGE,  AN_TYPE_POINT,  AN_TYPE_HILITE};
    uint32_t other = 0;
    for (uint32_t i = 0; i < count; ++i) {
        const uint32_t first = i * spacing + kAllocateStart;
        uint16_t type = 0;
        if (i % 10 == 5) {
            type = AN_TYPE_TEXT;
        } else if (i % 50 == 8) {
            type = AN_TYPE_PLACEHOLDER;
        } else {
            type = kOthers[other++ % (sizeof(kOthers) / sizeof(kOthers[0]))];
        }
        const bool extent = type == AN_TYPE_HILITE || type == AN_TYPE_RANGE;
        plan.push_back(Planned{type, first, extent && length > 0 ? first + length : first});
    }
    return plan;
}

uint32_t AddPlanned(const Document &doc, const Planned &anno, uint32_t tag) {
    const ANPos &start = doc.content()[anno.first];
    const ANPos &end = doc.content()[anno.last];
    switch (anno.type) {
        case AN_TYPE_HILITE:
        case AN_TYPE_POINT:
        case AN_TYPE_VALUE: {
            ANAnnoRecord d{};
            d.size = AN_RECORD_SIZE_POINT;
            d.tag = tag;
            d.start = start;
            d.end = end;
            d.value = tag;
            d.style = 0x00FF00u;  // a direct colour word
            return ANAddAnno(doc.doc(), anno.type, &d);
        }
        case AN_TYPE_RANGE: {
            ANRangeDesc d{};
            d.size = sizeof(d);
            d.tag = tag;
            d.start = start;
            d.end = end;
            return ANAddAnno(doc.doc(), anno.type, &d);
        }
        case AN_TYPE_TEXT: {
            ANTextDesc d{};
            d.size = sizeof(d);
            d.tag = tag;
            d.pos = start;
            d.text = reinterpret_cast<const uint16_t *>(kNote);
            d.textLength = sizeof(kNote) / sizeof(kNote[0]) - 1;
            return ANAddAnno(doc.doc(), anno.type, &d);
        }
        default: {
            ANPointDesc d{};
            d.size = sizeof(d);
            d.tag = tag;
            d.pos = start;
            return ANAddAnno(doc.doc(), anno.type, &d);
        }
    }
}

Document &AnnotatedDocument(uint32_t positions, uint32_t count) {
    static std::map<std::pair<uint32_t, uint32_t>, std::unique_ptr<Document>> made;
    auto &slot = made[{positions, count}];
    if (!slot) {
        slot = std::make_unique<Document>(positions);
        uint32_t tag = 1;
        for (const Planned &anno : Plan(count, static_cast<uint32_t>(slot->content().size()))) {
            AddPlanned(*slot, anno, tag++);
        }
    }
    return *slot;
}

TableMemory MeasureTable(DAHandle doc) {
    TableMemory memory;
    const auto *instance = static_cast<const ANInstance *>(antk::annoSlot(doc));
    if (instance == nullptr || instance->entries == nullptr) return memory;
    const ANEntryTable *table = instance->entries;
    memory.table = ANTableBytes(table->capacity);
    memory.index = ANIndexBytes(instance);
    memory.entries = table->count;
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        if (entry.type == AN_TYPE_TEXT)
            memory.texts += sizeof(uint16_t) * entry.record.textCapacity;
    }
    return memory;
}

void ReportTable(benchmark::State &state, DAHandle doc) {
    const TableMemory memory = MeasureTable(doc);
    state.counters["entries"] = memory.entries;
    state.counters["table_bytes"] = static_cast<double>(memory.Total());
    state.counters["index_B_per_anno"] =
        memory.entries == 0 ? 0.0 : static_cast<double>(memory.index) / memory.entries;
}

}  // namespace annobench
