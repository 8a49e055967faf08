// Making and freeing style tables.
#include "hosts/heap.h"
#include "styles/styles.h"

ANStyleTable *ANNewStyleTable() { return ANHeapNew<ANStyleTable>(); }

void ANFreeStyleTable(ANStyleTable *table) {
    if (table == nullptr) return;
    ANHeapFree(table->styles);
    ANHeapFree(table);
}
