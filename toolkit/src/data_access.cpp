// The data-access and utility modules: document handles, module data, options and
// documents opened over another document's content.
#include <cstring>
#include <new>

#include "model.h"

using antk::Fn;
using antk::detail::failing;
using antk::detail::kErrBadArgument;
using antk::detail::kErrNoMemory;

void DARetrieved::lock() {
    std::unique_lock<std::mutex> guard(mutex);
    const std::thread::id me = std::this_thread::get_id();
    released.wait(guard, [&] { return depth == 0 || owner == me; });
    owner = me;
    ++depth;
}

void DARetrieved::unlock() {
    std::unique_lock<std::mutex> guard(mutex);
    if (depth == 0 || owner != std::this_thread::get_id()) {
        return;
    }
    if (--depth == 0) {
        owner = std::thread::id();
        guard.unlock();
        released.notify_all();
    }
}

extern "C" {

uint32_t DAGetAnno(DAHandle doc, void **instance) {
    uint32_t code;
    if (failing(Fn::DAGetAnno, code)) {
        return code;
    }
    if (doc == nullptr || instance == nullptr) {
        return kErrBadArgument;
    }
    *instance = doc->retrieved.slots[ANMOD_SLOT_ANNO];
    return 0;
}

uint32_t DARetrieveDocHandle(DAHandle doc, DARetrievedDoc *retrieved) {
    uint32_t code;
    if (failing(Fn::DARetrieveDocHandle, code)) {
        return code;
    }
    if (doc == nullptr || retrieved == nullptr) {
        return kErrBadArgument;
    }
    *retrieved = &doc->retrieved;
    return 0;
}

uint32_t DALockModuleData(DARetrievedDoc retrieved, void ***slots) {
    uint32_t code;
    if (failing(Fn::DALockModuleData, code)) {
        return code;
    }
    if (retrieved == nullptr || slots == nullptr) {
        return kErrBadArgument;
    }
    retrieved->lock();
    *slots = retrieved->slots;
    return 0;
}

// An injected failure still ends the lock: a failure sweep must not leave a document
// locked for the rest of a test.
uint32_t DAUnlockModuleData(DARetrievedDoc retrieved) {
    uint32_t code;
    const bool failed = failing(Fn::DAUnlockModuleData, code);
    if (retrieved == nullptr) {
        return failed ? code : kErrBadArgument;
    }
    retrieved->unlock();
    return failed ? code : 0;
}

uint32_t DADestroyModuleData(DARetrievedDoc retrieved) {
    uint32_t code;
    if (failing(Fn::DADestroyModuleData, code)) {
        return code;
    }
    if (retrieved == nullptr) {
        return kErrBadArgument;
    }
    for (void *&s : retrieved->slots) {
        s = nullptr;
    }
    retrieved->destroyed.store(true);
    return 0;
}

uint32_t DAGetHChunker(DAHandle doc, CHHandle *chunker) {
    uint32_t code;
    if (failing(Fn::DAGetHChunker, code)) {
        return code;
    }
    if (doc == nullptr || chunker == nullptr) {
        return kErrBadArgument;
    }
    // A document opened over another's content always has the chunker it came from.
    const bool has = doc->model->hasChunker || doc->secondary;
    *chunker = has ? &doc->model->chunker : nullptr;
    return 0;
}

uint32_t DAGetOption(DARetrievedDoc retrieved, uint32_t option, uint32_t flags, uint32_t *value) {
    (void)flags;
    uint32_t code;
    if (failing(Fn::DAGetOption, code)) {
        return code;
    }
    if (retrieved == nullptr || value == nullptr || option != ANMOD_OPTION_CHARSET) {
        return kErrBadArgument;
    }
    *value = retrieved->doc->model->option;
    return 0;
}

uint32_t DAOpenDocument(DAHandle *newDoc, uint32_t kind, void *source, uint32_t flags) {
    (void)flags;
    uint32_t code;
    if (failing(Fn::DAOpenDocument, code)) {
        return code;
    }
    if (newDoc == nullptr || kind != ANMOD_OPEN_FROM_CHUNKER || source == nullptr) {
        return kErrBadArgument;
    }
    CHHandle chunker = nullptr;
    std::memcpy(&chunker, source, sizeof(CHHandle));
    if (chunker == nullptr || chunker->model == nullptr) {
        return kErrBadArgument;
    }
    DADocument *doc = new (std::nothrow) DADocument;
    if (doc == nullptr) {
        return kErrNoMemory;
    }
    doc->model = chunker->model->shared_from_this();
    doc->retrieved.doc = doc;
    doc->secondary = true;
    antk::detail::openSecondaryCount.fetch_add(1);
    *newDoc = doc;
    return 0;
}

// Any character set is accepted; every one but the wide set delivers one byte per
// character.
uint32_t DASetOption(DAHandle doc, uint32_t option, const void *value, uint32_t size) {
    uint32_t code;
    if (failing(Fn::DASetOption, code)) {
        return code;
    }
    if (doc == nullptr || value == nullptr || option != ANMOD_SETOPT_CHARSET ||
        size != sizeof(uint32_t)) {
        return kErrBadArgument;
    }
    uint32_t charSet = 0;
    std::memcpy(&charSet, value, sizeof charSet);
    doc->charSet.store(charSet);
    return 0;
}

// Only documents from DAOpenDocument are closed here; built documents go with
// antk::destroyDocument. An injected failure still closes the document, so that
// failure sweeps leak nothing.
uint32_t DACloseDocument(DAHandle doc) {
    uint32_t code;
    const bool failed = failing(Fn::DACloseDocument, code);
    if (doc == nullptr || !doc->secondary) {
        return failed ? code : kErrBadArgument;
    }
    delete doc;
    antk::detail::openSecondaryCount.fetch_sub(1);
    return failed ? code : 0;
}

// It cannot fail; an injected failure makes it answer with the code in place of the
// character set.
uint32_t UTGetOSCharSet(void) {
    uint32_t code;
    if (failing(Fn::UTGetOSCharSet, code)) {
        return code;
    }
    return antk::kDefaultOSCharSet;
}

}  // extern "C"
