// What a full tracking call must report at a position, read from the entries that
// cover it: shared by the tracking tests, the fuzz target's oracles and the
// benchmarks' peers, which each hold the library against the same reading.
#ifndef ANNO_TESTS_SUPPORT_TRACK_MODEL_H
#define ANNO_TESTS_SUPPORT_TRACK_MODEL_H

#include <cstdint>
#include <vector>

#include "anno/anno.h"

namespace annotest {

// The tracking bit an annotation type is reported with (0 for a type without one).
inline uint32_t TrackBitOf(uint16_t type) {
    constexpr uint32_t kBits[] = {0,
                                  ANTRACK_BIT_HILITE,
                                  ANTRACK_BIT_POINT,
                                  ANTRACK_BIT_RANGE,
                                  ANTRACK_BIT_VALUE,
                                  ANTRACK_BIT_TEXT,
                                  0,
                                  ANTRACK_BIT_CUTMARK};
    return type < 8 ? kBits[type] : 0;
}

// Whether highlight `e` keeps out of the way of `h`, the one in force: it runs on
// further from a lower slot, or has the very same extent. `Entry` has `slot` and
// `record`.
template <typename Entry>
bool Yields(const Entry &e, const Entry &h) {
    const int ends = ANCompPos(&e.record.end, &h.record.end);
    if (ends > 0 && e.slot < h.slot) return true;
    return ends == 0 && ANCompPos(&e.record.start, &h.record.start) == 0;
}

// The outputs of a full call. Seeded with what carries over from the call before
// (bits of ranges, marks and highlights that ended, the record's userData, value and
// text), then read from the covering entries.
template <typename Entry>
struct CoverReading {
    uint32_t bits = 0;
    uint64_t userData = 0;
    uint64_t value = 0;
    const uint16_t *text = nullptr;
    uint32_t textLength = 0;
    bool range = false;
    bool mark = false;
    const Entry *hilite = nullptr;  // the highlight whose style is reported
};

// Reads the entries in `cover` (slots, in list order); `list[at[slot]]` is the entry
// of a slot.
template <typename Entry, typename At>
CoverReading<Entry> ReadCover(CoverReading<Entry> r, const std::vector<uint16_t> &cover,
                              const std::vector<Entry> &list, const At &at) {
    for (uint16_t slot : cover) {
        const Entry &e = list[static_cast<size_t>(at[slot])];
        r.bits |= TrackBitOf(e.type);
        switch (e.type) {
            case AN_TYPE_HILITE:
                if (r.hilite == nullptr || !Yields(e, *r.hilite)) {
                    r.hilite = &e;
                    r.userData = e.record.userData;
                }
                break;
            case AN_TYPE_POINT:
            case AN_TYPE_VALUE:
                r.value = e.record.value;
                break;
            case AN_TYPE_RANGE:
                r.range = true;
                r.userData = e.record.userData;
                break;
            case AN_TYPE_TEXT:
                r.userData = e.record.userData;
                r.text = e.record.textBuffer;
                r.textLength = e.record.textLength;
                break;
            case AN_TYPE_CUTMARK:
                r.mark = true;
                break;
            default:
                break;
        }
    }
    return r;
}

}  // namespace annotest

#endif  // ANNO_TESTS_SUPPORT_TRACK_MODEL_H
