// Range splitting, first form: the range is stored as one entry, as its caller gave
// it. Fitting it to the document's items and cutting it into pieces comes later
// behind the same call.
#include "ranges/split.h"

#include <cstring>

#include "binding/instance.h"

namespace {

// Bytes of a type-3 record that range splitting takes over from its caller.
constexpr size_t kRangeRecordBytes = AN_RECORD_SIZE_SHORT;

}  // namespace

uint32_t ANSplitRangeAnno(DAHandle doc, const ANAnnoRecord *record, ANAnnoRecord *entry,
                          uint32_t *insertLast, uint16_t entryFlags) {
    (void)entryFlags;  // no pieces are added here
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    if (record == nullptr || entry == nullptr || insertLast == nullptr) return AN_ERR_BADARG;
    *insertLast = 0;
    std::memcpy(entry, record, kRangeRecordBytes);
    *insertLast = 1;
    return AN_OK;
}
