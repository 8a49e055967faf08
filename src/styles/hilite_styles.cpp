// The exported style operations: global tables given by handle, and the per-document
// table of an annotation state with the global table bound to it.
#include "anno/anno.h"
#include "binding/instance.h"
#include "styles/styles.h"

extern "C" AN_API uint32_t ANInitGlobalHiliteStyles(ANStyleTable **table) {
    if (table == nullptr) return AN_ERR_BADARG;
    *table = ANNewStyleTable();
    return *table == nullptr ? AN_ERR_NOMEM : AN_OK;
}

extern "C" AN_API uint32_t ANDeInitGlobalHiliteStyles(ANStyleTable *table) {
    if (table == nullptr) return AN_ERR_BADARG;
    ANFreeStyleTable(table);
    return AN_OK;
}

extern "C" AN_API uint32_t ANGetGlobalHiliteStyle(ANStyleTable *table, uint32_t styleId,
                                                  ANHiliteStyle *style) {
    if (table == nullptr) return AN_ERR_BADARG;
    const ANHiliteStyle *found = ANFindStyle(table, styleId);
    if (found == nullptr) return AN_ERR_NOTFOUND;
    if (style != nullptr) *style = *found;
    return AN_OK;
}

extern "C" AN_API uint32_t ANAddGlobalHiliteStyle(ANStyleTable *table, const ANHiliteStyle *style) {
    return ANAddStyle(table, style);
}

extern "C" AN_API uint32_t ANGetHiliteStyle(DAHandle doc, uint32_t styleId, ANHiliteStyle *style) {
    ANInstance *instance = nullptr;
    if (ANFindState(doc, &instance) != AN_OK || instance->styles == nullptr) return 0;
    // The document's own style shadows a global one with the same id.
    const ANHiliteStyle *found = ANFindStyle(instance->styles, styleId);
    if (found == nullptr) found = ANFindStyle(instance->globalStyles, styleId);
    if (found == nullptr) return 0;
    if (style != nullptr) *style = *found;
    return 1;
}

extern "C" AN_API uint32_t ANAddHiliteStyle(DAHandle doc, const ANHiliteStyle *style) {
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    return ANAddStyle(instance->styles, style);
}
