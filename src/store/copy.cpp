// Copying every annotation and per-document style of one document into another.
#include "anno/anno.h"
#include "binding/instance.h"
#include "store/store.h"
#include "store/table.h"
#include "styles/styles.h"

extern "C" AN_API uint32_t ANCopyAnnos(DAHandle dest, DAHandle src) {
    ANInstance *source = nullptr;
    uint32_t rc = ANFindState(src, &source);
    if (rc != AN_OK) return rc;
    // Nothing to copy: the destination is not even looked at.
    if (source->entries == nullptr) return AN_OK;

    ANInstance *target = nullptr;
    rc = ANFindState(dest, &target);
    if (rc != AN_OK) return rc;
    // Onto itself the walk would meet the entries it inserts, and every annotation and
    // style is already there: the document stays as it is.
    if (target == source) return AN_OK;

    const ANEntryTable *table = source->entries;
    for (uint16_t i = table->first; i != AN_NONE; i = ANSlot(table, i).next) {
        const ANEntry &entry = ANSlot(table, i);
        // Insertion writes to the record it is given (a text's buffer is taken over
        // for the duration, its capacity recomputed); a copy keeps the source as it is.
        // The copy carries no ownership of userData: the source's caller gave the
        // block to the source, so the destination never frees it.
        ANAnnoRecord record = entry.record;
        ANInsertEntry(target, entry.type, &record, ANINSERT_COPY, 0);
    }

    if (source->styles == nullptr) return AN_OK;
    rc = ANFindState(dest, &target);
    if (rc != AN_OK) return rc;
    ANCopyStyleTable(target->styles, source->styles);
    return AN_OK;
}
