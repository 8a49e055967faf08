// Adding annotations: the caller's descriptor forms, normalised into an
// ANAnnoRecord, and the add operation that every addition goes through.
#include <cstring>

#include "anno/anno.h"
#include "binding/instance.h"
#include "ranges/split.h"
#include "store/store.h"

namespace {

// Accepted descriptor sizes, by type.
constexpr uint32_t kHiliteFull = 72;
constexpr uint32_t kHiliteShort = 60;
constexpr uint32_t kHiliteMinimal = 48;
constexpr uint32_t kPointFull = 72;
constexpr uint32_t kPointShort = 64;
constexpr uint32_t kPointItem = 32;  // type 2 only
constexpr uint32_t kRangeFull = 48;
constexpr uint32_t kRangeShort = 44;
constexpr uint32_t kRangeMinimal = 40;
constexpr uint32_t kTextFull = 48;
constexpr uint32_t kMarkFull = 32;
constexpr uint32_t kMarkShort = 28;

// Byte offsets inside the descriptor forms.
constexpr size_t kOffTag = 4;
constexpr size_t kOffStart = 8;
constexpr size_t kOffEnd = 24;
constexpr size_t kOffEventMask = 40;
constexpr size_t kOffShortUserData = 44;  // 60- and 64-byte forms: 32-bit userData
constexpr size_t kOffShortStyle = 56;     // 60-byte form of type 1
constexpr size_t kOffMinimalStyle = 44;   // 48-byte form of type 1
constexpr size_t kOffShortValue64 = 56;   // 64-byte form of types 2 and 4
constexpr size_t kOffItemId = 8;          // 32-byte form of type 2
constexpr size_t kOffItemEventMask = 16;
constexpr size_t kOffItemValue64 = 24;
constexpr size_t kOffRangeUserData = 40;
constexpr size_t kOffPosition = 8;  // types 5, 6 and 7: the one position
constexpr size_t kOffPointUserData = 24;
constexpr size_t kOffText = 32;
constexpr size_t kOffTextLength = 40;

// The high half of `value` in a normalised type-3 record.
constexpr uint64_t kRangeValue = 0xFFFFFFFF00000000ull;

// Bytes of the normalised record that the entry of each type takes over.
constexpr size_t kEntryBytesLong = AN_RECORD_SIZE_POINT;   // types 1 and 2
constexpr size_t kEntryBytesShort = AN_RECORD_SIZE_SHORT;  // types 4, 6 and 7
constexpr size_t kEntryBytesText = AN_RECORD_SIZE_TEXT;    // type 5

// Reads the descriptor as bytes: its forms are not all C records.
class Bytes {
 public:
    explicit Bytes(const void *data) : data_(static_cast<const unsigned char *>(data)) {}
    uint32_t u32(size_t offset) const { return read<uint32_t>(offset); }
    uint64_t u64(size_t offset) const { return read<uint64_t>(offset); }
    ANPos pos(size_t offset) const { return read<ANPos>(offset); }
    // The forms that are a prefix of ANAnnoRecord are taken over whole.
    void copy(ANAnnoRecord *to, size_t bytes) const { std::memcpy(to, data_, bytes); }

 private:
    template <typename T>
    T read(size_t offset) const {
        T value;
        std::memcpy(&value, data_ + offset, sizeof(T));
        return value;
    }
    const unsigned char *data_;
};

// Each normaliser fills a record that starts all zero; false for a size the type
// does not take.
bool NormaliseHilite(const Bytes &in, uint32_t size, ANAnnoRecord *out) {
    if (size == kHiliteFull) {
        in.copy(out, kHiliteFull);
    } else if (size == kHiliteShort) {
        out->tag = in.u32(kOffTag);
        out->start = in.pos(kOffStart);
        out->end = in.pos(kOffEnd);
        out->eventMask = in.u32(kOffEventMask);
        out->userData = in.u32(kOffShortUserData);
        out->style = in.u32(kOffShortStyle);
    } else if (size == kHiliteMinimal) {
        out->tag = in.u32(kOffTag);
        out->start = in.pos(kOffStart);
        out->end = in.pos(kOffEnd);
        out->eventMask = in.u32(kOffEventMask);
        out->style = in.u32(kOffMinimalStyle);
    } else {
        return false;
    }
    out->size = AN_RECORD_SIZE_POINT;
    return true;
}

bool NormalisePoint(uint16_t type, const Bytes &in, uint32_t size, ANAnnoRecord *out) {
    if (size == kPointFull) {
        in.copy(out, kPointFull);
    } else if (size == kPointShort) {
        out->tag = in.u32(kOffTag);
        out->start = in.pos(kOffStart);
        out->eventMask = in.u32(kOffEventMask);
        out->userData = in.u32(kOffShortUserData);
        out->value64 = in.u64(kOffShortValue64);
    } else if (size == kPointItem && type == AN_TYPE_POINT) {
        out->tag = in.u32(kOffTag);
        out->start.itemId = in.u32(kOffItemId);
        out->eventMask = in.u32(kOffItemEventMask);
        out->value64 = in.u64(kOffItemValue64);
    } else {
        return false;
    }
    out->end = out->start;  // a point's extent comes from its start alone
    out->size = AN_RECORD_SIZE_POINT;
    return true;
}

bool NormaliseRange(const Bytes &in, uint32_t size, ANAnnoRecord *out) {
    if (size != kRangeFull && size != kRangeShort && size != kRangeMinimal) return false;
    out->tag = in.u32(kOffTag);
    out->start = in.pos(kOffStart);
    out->end = in.pos(kOffEnd);
    if (size == kRangeFull) out->userData = in.u64(kOffRangeUserData);
    if (size == kRangeShort) out->userData = in.u32(kOffRangeUserData);
    out->value = kRangeValue;
    out->size = AN_RECORD_SIZE_SHORT;
    return true;
}

bool NormaliseText(const Bytes &in, uint32_t size, ANAnnoRecord *out) {
    if (size != kTextFull) return false;
    out->tag = in.u32(kOffTag);
    out->start = in.pos(kOffPosition);
    out->end = out->start;
    out->userData = in.u64(kOffPointUserData);
    uint64_t text = in.u64(kOffText);
    std::memcpy(&out->text, &text, sizeof(out->text));
    out->textLength = in.u32(kOffTextLength);
    out->size = AN_RECORD_SIZE_TEXT;
    return true;
}

bool NormaliseMark(const Bytes &in, uint32_t size, ANAnnoRecord *out) {
    if (size != kMarkFull && size != kMarkShort) return false;
    out->tag = in.u32(kOffTag);
    out->start = in.pos(kOffPosition);
    out->end = out->start;
    out->userData = size == kMarkFull ? in.u64(kOffPointUserData) : in.u32(kOffPointUserData);
    out->size = AN_RECORD_SIZE_SHORT;
    return true;
}

bool Normalise(uint16_t type, const void *descriptor, ANAnnoRecord *out) {
    const Bytes in(descriptor);
    const uint32_t size = in.u32(0);
    switch (type) {
        case AN_TYPE_HILITE:
            return NormaliseHilite(in, size, out);
        case AN_TYPE_POINT:
        case AN_TYPE_VALUE:
            return NormalisePoint(type, in, size, out);
        case AN_TYPE_RANGE:
            return NormaliseRange(in, size, out);
        case AN_TYPE_TEXT:
            return NormaliseText(in, size, out);
        default:
            return NormaliseMark(in, size, out);
    }
}

// Bytes of the normalised record that the entry of `type` starts from.
size_t EntryBytes(uint16_t type) {
    switch (type) {
        case AN_TYPE_HILITE:
        case AN_TYPE_POINT:
            return kEntryBytesLong;
        case AN_TYPE_TEXT:
            return kEntryBytesText;
        default:
            return kEntryBytesShort;
    }
}

}  // namespace

uint32_t ANAddRecord(DAHandle doc, uint16_t type, ANAnnoRecord *record, uint32_t quiet,
                     uint16_t entryFlags) {
    ANInstance *instance = nullptr;
    uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    if (record == nullptr || type < AN_TYPE_HILITE || type > AN_TYPE_CUTMARK) return AN_ERR_BADARG;

    if (ANPosBefore(record->end, record->start)) {
        const ANPos start = record->start;
        record->start = record->end;
        record->end = start;
    }
    ANAnnoRecord notified = *record;

    ANAnnoRecord entry;
    std::memset(&entry, 0, sizeof(entry));
    bool insert = true;
    if (type == AN_TYPE_RANGE) {
        uint32_t insertLast = 0;
        rc = ANSplitRangeAnno(doc, record, &entry, &insertLast, entryFlags);
        if (insertLast == 0 && quiet != 0) return rc;
        if (rc != AN_OK) return rc;
        insert = insertLast != 0;
    } else {
        std::memcpy(&entry, record, EntryBytes(type));
        if (type != AN_TYPE_HILITE) entry.end = ANStepAfter(entry.start);
        // Annotation text whose one step wraps round (at sub-item 0xFFFFFFFE) would,
        // with its ends swapped, go to another anchor than the one it names.
        const bool text = type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER;
        if (text && ANPosBefore(entry.end, entry.start)) return AN_ERR_BADARG;
    }

    if (insert) {
        if (ANPosBefore(entry.end, entry.start)) {
            const ANPos start = entry.start;
            entry.start = entry.end;
            entry.end = start;
        }
        rc = ANInsertEntry(instance, type, &entry, ANINSERT_ADD, entryFlags);
        if (rc != AN_OK) return rc;
    }
    if (quiet == 0) ANNotify(instance, ANNOTIFY_ADDED, type, &notified);
    return AN_OK;
}

extern "C" AN_API uint32_t ANAddAnno(DAHandle doc, uint16_t type, const void *descriptor) {
    if (type < AN_TYPE_HILITE || type > AN_TYPE_CUTMARK || descriptor == nullptr) {
        return AN_ERR_BADARG;
    }
    ANAnnoRecord record;
    std::memset(&record, 0, sizeof(record));
    if (!Normalise(type, descriptor, &record)) return AN_ERR_BADARG;
    if (type == AN_TYPE_TEXT && record.text == nullptr && record.textLength != 0) {
        return AN_ERR_BADARG;
    }
    // Only blocks a caller hands over with these types are ever freed by the
    // library (ANClearUserData); built and copied entries never carry the flag.
    const bool ownsBlock =
        (type == AN_TYPE_HILITE || type == AN_TYPE_RANGE || type == AN_TYPE_TEXT) &&
        record.userData != 0;
    return ANAddRecord(doc, type, &record, 0, ownsBlock ? ANENTRY_OWNS_USERDATA : 0);
}
