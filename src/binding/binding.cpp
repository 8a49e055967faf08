// Making, finding and freeing a document's annotation state.
#include "anno/anno.h"
#include "binding/instance.h"
#include "binding/module_lock.h"
#include "hosts/heap.h"
#include "hosts/modules.h"
#include "store/index.h"
#include "store/table.h"
#include "styles/styles.h"

namespace {

constexpr uint32_t kNoSubItem = ANPOS_NOSUBITEM;

void ANFreeCharMaps(ANInstance *instance) {
    // The older record first, then the newer one.
    for (int i = 1; i >= 0; --i) {
        ANCharMap &map = instance->mapCache[i];
        if (map.block != nullptr) GlobalFree(map.block);
        map.block = nullptr;
        map.length = 0;
        map.chunk = ANMAP_NO_CHUNK;
    }
}

void ANCloseContent(ANInstance *instance) {
    if (instance->contentDoc == nullptr) return;
    if (instance->content != nullptr) CACloseContent(instance->content);
    DACloseDocument(instance->contentDoc);
    instance->content = nullptr;
    instance->contentDoc = nullptr;
}

// Frees everything an annotation state owns, then the state itself.
void ANFreeInstance(ANInstance *instance) {
    ANFreeTable(instance->entries);
    instance->entries = nullptr;
    ANFreeIndex(instance);
    ANFreeCharMaps(instance);
    ANFreeStyleTable(instance->styles);
    instance->styles = nullptr;
    ANCloseContent(instance);
    ANHeapFree(instance->orphans);  // the blocks themselves only ANClearUserData frees
    ANHeapFree(instance);
}

}  // namespace

uint32_t ANFindState(DAHandle doc, ANInstance **instance) {
    *instance = nullptr;
    if (doc == nullptr) return AN_ERR_BADARG;
    void *state = nullptr;
    const uint32_t rc = DAGetAnno(doc, &state);
    if (rc != 0) return rc;
    if (state == nullptr) return AN_ERR_NOSTATE;
    *instance = static_cast<ANInstance *>(state);
    return AN_OK;
}

uint32_t ANNotify(const ANInstance *instance, uint16_t code, uint16_t detail, void *record) {
    if (instance->callback == nullptr) return 0;
    return instance->callback(code, detail, record, instance->callbackData);
}

void ANResetHover(ANInstance *instance) {
    instance->hoverEntry = AN_NONE;
    instance->hoverPos.itemId = kNoSubItem;
    instance->hoverPos.subItemId = kNoSubItem;
}

extern "C" AN_API uint32_t ANInit(DAHandle doc, ANStyleTable *globalStyles, ANCallback callback,
                                  void *callbackData) {
    if (doc == nullptr) return AN_OK;
    CHHandle chunker = nullptr;
    uint32_t rc = DAGetHChunker(doc, &chunker);
    if (rc != 0) return rc;
    if (chunker == nullptr) return AN_OK;

    auto *instance = ANHeapNew<ANInstance>();
    if (instance == nullptr) return AN_ERR_NOMEM;
    instance->chunker = chunker;
    instance->globalStyles = globalStyles;
    instance->callback = callback;
    instance->callbackData = callbackData;
    ANResetHover(instance);
    for (ANCharMap &map : instance->mapCache) map.chunk = ANMAP_NO_CHUNK;
    instance->styles = ANNewStyleTable();  // stays null when out of memory

    DARetrievedDoc retrieved = nullptr;
    rc = DARetrieveDocHandle(doc, &retrieved);
    if (rc != 0) {
        ANFreeInstance(instance);
        return rc;
    }

    uint32_t option = 0;
    DAGetOption(retrieved, ANMOD_OPTION_CHARSET, 0, &option);
    instance->charSet =
        (option & ANMOD_OPTION_CHARSET_BIT) != 0 ? ANMOD_CHARSET_WIDE : UTGetOSCharSet();

    ANModuleDataLock lock(retrieved);
    if (lock.ok()) {
        lock.slots()[ANMOD_SLOT_ANNO] = instance;
    } else {
        DADestroyModuleData(retrieved);
        ANFreeInstance(instance);
    }
    return lock.result();
}

extern "C" AN_API uint32_t ANDeInit(DAHandle doc) {
    if (doc == nullptr) return AN_ERR_BADARG;
    DARetrievedDoc retrieved = nullptr;
    const uint32_t rc = DARetrieveDocHandle(doc, &retrieved);
    if (rc != 0) return rc;
    ANModuleDataLock lock(retrieved);
    if (!lock.ok()) return lock.result();
    void **slots = lock.slots();
    if (slots == nullptr || slots[ANMOD_SLOT_ANNO] == nullptr) return AN_OK;
    ANFreeInstance(static_cast<ANInstance *>(slots[ANMOD_SLOT_ANNO]));
    slots[ANMOD_SLOT_ANNO] = nullptr;
    return AN_OK;
}

extern "C" AN_API uint32_t ANSetCallback(DAHandle doc, ANCallback callback, void *callbackData) {
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    instance->callback = callback;
    instance->callbackData = callbackData;
    return AN_OK;
}
