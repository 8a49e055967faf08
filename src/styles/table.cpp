// Making, searching, filling, copying and freeing style tables.
#include <cstring>

#include "hosts/heap.h"
#include "styles/styles.h"

namespace {

// Reads a caller's record of either form into the current form. The older form is
// read field by field so that nothing past its 24 bytes is touched.
bool ANReadStyleRecord(const ANHiliteStyle *input, ANHiliteStyle *record) {
    if (input->size == ANHILITESTYLE_SIZE) {
        std::memcpy(record, input, sizeof(ANHiliteStyle));
        return true;
    }
    if (input->size != ANHILITESTYLE_SIZE_OLD) return false;
    record->size = ANHILITESTYLE_SIZE;
    record->styleId = input->styleId;
    record->flags = input->flags;
    record->color1 = input->color1;
    record->color2 = input->color2;
    record->attr1 = input->attr1;
    record->attr2 = ANSTYLE_OLD_FORM_ATTR2;
    record->reserved = 0;
    return true;
}

ANHiliteStyle *ANFindSlot(ANStyleTable *table, uint32_t styleId) {
    return const_cast<ANHiliteStyle *>(ANFindStyle(table, styleId));
}

// Makes room for one more record. The array always keeps one slot spare after an
// add, and a growth that fails or would overflow `capacity` leaves the table alone.
uint32_t ANReserveSlot(ANStyleTable *table) {
    if (table->styles == nullptr) {
        auto *styles = ANHeapNew<ANHiliteStyle>(ANSTYLE_GROWTH, false);
        if (styles == nullptr) return AN_ERR_NOMEM;
        table->styles = styles;
        table->count = 0;
        table->capacity = ANSTYLE_GROWTH;
        return AN_OK;
    }
    if (uint32_t{table->count} + 1 < table->capacity) return AN_OK;
    const uint32_t grown = uint32_t{table->capacity} + ANSTYLE_GROWTH;
    if (grown > ANSTYLE_CAPACITY_LIMIT) return AN_ERR_NOMEM;
    void *block = ANHeapReAlloc(table->styles, sizeof(ANHiliteStyle) * grown);
    if (block == nullptr) return AN_ERR_NOMEM;
    table->styles = static_cast<ANHiliteStyle *>(block);
    table->capacity = static_cast<uint16_t>(grown);
    return AN_OK;
}

}  // namespace

ANStyleTable *ANNewStyleTable() { return ANHeapNew<ANStyleTable>(); }

void ANFreeStyleTable(ANStyleTable *table) {
    if (table == nullptr) return;
    ANHeapFree(table->styles);
    ANHeapFree(table);
}

const ANHiliteStyle *ANFindStyle(const ANStyleTable *table, uint32_t styleId) {
    if (table == nullptr || table->styles == nullptr) return nullptr;
    for (uint16_t i = 0; i < table->count; ++i) {
        if (table->styles[i].styleId == styleId) return &table->styles[i];
    }
    return nullptr;
}

uint32_t ANAddStyle(ANStyleTable *table, const ANHiliteStyle *style) {
    if (table == nullptr || style == nullptr) return AN_ERR_BADARG;
    // Taken into a record of our own first: the input may lie in this very array,
    // which growing can move. The older form needs no heap copy this way either.
    ANHiliteStyle record;
    if (!ANReadStyleRecord(style, &record)) return AN_ERR_BADARG;

    ANHiliteStyle *present = ANFindSlot(table, record.styleId);
    if (present != nullptr) {
        *present = record;
        return AN_OK;
    }
    const uint32_t rc = ANReserveSlot(table);
    if (rc != AN_OK) return rc;
    table->styles[table->count] = record;
    table->count++;
    return AN_OK;
}

uint32_t ANCopyStyleTable(ANStyleTable *dest, const ANStyleTable *src) {
    if (dest == nullptr || src == nullptr) return AN_ERR_BADARG;
    // The source's count is fixed first; with dest == src every add is a replacement.
    const uint16_t count = src->styles == nullptr ? 0 : src->count;
    for (uint16_t i = 0; i < count; ++i) ANAddStyle(dest, &src->styles[i]);
    return AN_OK;
}
