// Freeing an annotation table.
#include "store/table.h"

#include "hosts/heap.h"

void ANFreeTable(ANEntryTable *table) {
    if (table == nullptr) return;
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        ANEntry &entry = ANSlot(table, i);
        if (entry.type == AN_TYPE_TEXT) {
            ANHeapFree(entry.record.textBuffer);
            entry.record.textBuffer = nullptr;
        }
    }
    ANHeapFree(table);
}
