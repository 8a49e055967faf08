// The chunker module over a document model: items (class 0), sections (class 1),
// characters (class 2) and document ranges (class 16). One run per chunk.
#include <algorithm>
#include <cstring>

#include "model.h"

using antk::Fn;
using antk::detail::chunkOf;
using antk::detail::failing;
using antk::detail::indexOf;
using antk::detail::ItemRec;
using antk::detail::kErrBadArgument;
using antk::detail::kErrNotFound;
using antk::detail::kNoId;
using antk::detail::makeId;
using antk::detail::Model;

namespace {

template <typename Record>
void fill(Record *out, uint32_t f1, uint32_t f2, uint32_t f3) {
    std::memset(out, 0, sizeof *out);
    out->field1 = f1;
    out->field2 = f2;
    out->field3 = f3;
}

// The id of the item after `id` in document order, or kNoId at the last item.
uint32_t nextItem(const Model &m, uint32_t id) {
    const uint32_t c = chunkOf(id);
    if (indexOf(id) + 1 < m.chunks[c].items.size()) {
        return id + 1;
    }
    return c + 1 < m.chunks.size() ? makeId(c + 1, 0) : kNoId;
}

bool validChar(const Model &m, uint32_t id) {
    return chunkOf(id) < m.chunks.size() && indexOf(id) < m.chunks[chunkOf(id)].charCount;
}

// The character after `id`, across chunks without characters; kNoId at the last.
uint32_t nextChar(const Model &m, uint32_t id) {
    uint32_t c = chunkOf(id);
    if (indexOf(id) + 1 < m.chunks[c].charCount) {
        return id + 1;
    }
    for (++c; c < m.chunks.size(); ++c) {
        if (m.chunks[c].charCount > 0) {
            return makeId(c, 0);
        }
    }
    return kNoId;
}

// Index of a section or range id, or kNoId.
uint32_t indexFromId(uint32_t id, uint32_t base, std::size_t count) {
    if (id < base || id - base >= count) {
        return kNoId;
    }
    return id - base;
}

const Model *modelOf(CHHandle ch) { return ch == nullptr ? nullptr : ch->model; }

uint32_t lastItemOfChunk(const Model &m, uint32_t c) {
    return makeId(c, static_cast<uint32_t>(m.chunks[c].items.size() - 1));
}

}  // namespace

extern "C" {

uint32_t CHGetItem(CHHandle ch, uint32_t idClass, uint32_t id, CHItemInfo *info, uint32_t *nextId) {
    uint32_t code;
    if (failing(Fn::CHGetItem, code)) {
        return code;
    }
    const Model *m = modelOf(ch);
    if (m == nullptr || info == nullptr) {
        return kErrBadArgument;
    }
    uint32_t next = kNoId;
    switch (idClass) {
        case ANMOD_CLASS_ITEM: {
            const ItemRec *item = m->findItem(id);
            if (item == nullptr) {
                return kErrNotFound;
            }
            fill(info, item->type, item->field2, item->field3);
            next = nextItem(*m, id);
            break;
        }
        case ANMOD_CLASS_SECTION: {
            const uint32_t s = indexFromId(id, antk::kSectionIdBase, m->sections.size());
            if (s == kNoId) {
                return kErrNotFound;
            }
            const antk::detail::SectionRec &sec = m->sections[s];
            fill(info, makeId(sec.firstChunk, 0), lastItemOfChunk(*m, sec.lastChunk),
                 sec.lastChunk - sec.firstChunk + 1);
            if (s + 1 < m->sections.size()) {
                next = id + 1;
            }
            break;
        }
        case ANMOD_CLASS_RANGE: {
            const uint32_t r = indexFromId(id, antk::kRangeIdBase, m->ranges.size());
            if (r == kNoId) {
                return kErrNotFound;
            }
            fill(info, m->ranges[r].firstItem, m->ranges[r].code, 0);
            if (r + 1 < m->ranges.size()) {
                next = id + 1;
            }
            break;
        }
        default:
            return kErrBadArgument;
    }
    if (nextId != nullptr) {
        *nextId = next;
    }
    return 0;
}

uint32_t CHNextItemId(CHHandle ch, uint32_t idClass, uint32_t id, uint32_t *next) {
    uint32_t code;
    if (failing(Fn::CHNextItemId, code)) {
        return code;
    }
    const Model *m = modelOf(ch);
    if (m == nullptr || next == nullptr) {
        return kErrBadArgument;
    }
    uint32_t result = kNoId;
    switch (idClass) {
        case ANMOD_CLASS_ITEM:
            if (m->findItem(id) == nullptr) {
                return kErrNotFound;
            }
            result = nextItem(*m, id);
            break;
        case ANMOD_CLASS_CHAR:
            if (!validChar(*m, id)) {
                return kErrNotFound;
            }
            result = nextChar(*m, id);
            break;
        case ANMOD_CLASS_SECTION:
        case ANMOD_CLASS_RANGE: {
            const bool sections = idClass == ANMOD_CLASS_SECTION;
            const uint32_t base = sections ? antk::kSectionIdBase : antk::kRangeIdBase;
            const std::size_t count = sections ? m->sections.size() : m->ranges.size();
            const uint32_t i = indexFromId(id, base, count);
            if (i == kNoId) {
                return kErrNotFound;
            }
            if (i + 1 < count) {
                result = id + 1;
            }
            break;
        }
        default:
            return kErrBadArgument;
    }
    if (result == kNoId) {
        return kErrNotFound;
    }
    *next = result;
    return 0;
}

uint32_t CHGetItemId(CHHandle ch, uint32_t idClass, uint32_t index, uint32_t *id) {
    uint32_t code;
    if (failing(Fn::CHGetItemId, code)) {
        return code;
    }
    const Model *m = modelOf(ch);
    if (m == nullptr || id == nullptr) {
        return kErrBadArgument;
    }
    switch (idClass) {
        case ANMOD_CLASS_ITEM:
        case ANMOD_CLASS_CHAR: {
            const bool chars = idClass == ANMOD_CLASS_CHAR;
            if (index >= (chars ? m->totalChars : m->totalItems)) {
                return kErrNotFound;
            }
            // The last chunk starting at or before the ordinal holds it: chunks in
            // between without any are passed by upper_bound.
            const auto it = std::upper_bound(m->chunks.begin(), m->chunks.end(), index,
                                             [chars](uint32_t v, const antk::detail::ChunkRec &c) {
                                                 return v < (chars ? c.firstChar : c.firstItem);
                                             });
            const auto c = static_cast<uint32_t>(it - m->chunks.begin()) - 1;
            const uint32_t first = chars ? m->chunks[c].firstChar : m->chunks[c].firstItem;
            *id = makeId(c, index - first);
            return 0;
        }
        case ANMOD_CLASS_SECTION:
            if (index >= m->sections.size()) {
                return kErrNotFound;
            }
            *id = antk::kSectionIdBase + index;
            return 0;
        case ANMOD_CLASS_RANGE:
            if (index >= m->ranges.size()) {
                return kErrNotFound;
            }
            *id = antk::kRangeIdBase + index;
            return 0;
        default:
            return kErrBadArgument;
    }
}

uint32_t CHGetItemCount(CHHandle ch, uint32_t idClass, uint32_t *count) {
    uint32_t code;
    if (failing(Fn::CHGetItemCount, code)) {
        return code;
    }
    const Model *m = modelOf(ch);
    if (m == nullptr || count == nullptr) {
        return kErrBadArgument;
    }
    switch (idClass) {
        case ANMOD_CLASS_ITEM:
            *count = m->totalItems;
            return 0;
        case ANMOD_CLASS_SECTION:
            *count = static_cast<uint32_t>(m->sections.size());
            return 0;
        case ANMOD_CLASS_CHAR:
            *count = m->totalChars;
            return 0;
        case ANMOD_CLASS_RANGE:
            *count = static_cast<uint32_t>(m->ranges.size());
            return 0;
        default:
            return kErrBadArgument;
    }
}

// The number of items or characters before `id`. An id one past a chunk's last
// character (or item), such as chunk << 16 for a chunk without characters, counts
// everything before that place.
uint32_t CHGetItemCountById(CHHandle ch, uint32_t idClass, uint32_t id, uint32_t *count) {
    uint32_t code;
    if (failing(Fn::CHGetItemCountById, code)) {
        return code;
    }
    const Model *m = modelOf(ch);
    if (m == nullptr || count == nullptr) {
        return kErrBadArgument;
    }
    if (idClass != ANMOD_CLASS_CHAR && idClass != ANMOD_CLASS_ITEM) {
        return kErrBadArgument;
    }
    const bool chars = idClass == ANMOD_CLASS_CHAR;
    const uint32_t c = chunkOf(id);
    if (c == m->chunks.size() && indexOf(id) == 0) {
        *count = chars ? m->totalChars : m->totalItems;
        return 0;
    }
    if (c >= m->chunks.size()) {
        return kErrNotFound;
    }
    const antk::detail::ChunkRec &chunk = m->chunks[c];
    const uint32_t limit = chars ? chunk.charCount : static_cast<uint32_t>(chunk.items.size());
    if (indexOf(id) > limit) {
        return kErrNotFound;
    }
    *count = (chars ? chunk.firstChar : chunk.firstItem) + indexOf(id);
    return 0;
}

// Any id whose chunk exists (item or character id) lies in that chunk's run.
uint32_t CHGetRunFromItemId(CHHandle ch, uint32_t id, uint32_t *run) {
    uint32_t code;
    if (failing(Fn::CHGetRunFromItemId, code)) {
        return code;
    }
    const Model *m = modelOf(ch);
    if (m == nullptr || run == nullptr) {
        return kErrBadArgument;
    }
    if (chunkOf(id) >= m->chunks.size()) {
        return kErrNotFound;
    }
    *run = chunkOf(id);
    return 0;
}

// Mode 0: the run's first and last item ids. Mode 2: its first and last character
// ids; a run without characters reports last = first - 1.
uint32_t CHGetRunInfo(CHHandle ch, uint32_t run, uint32_t mode, CHRunInfo *info) {
    uint32_t code;
    if (failing(Fn::CHGetRunInfo, code)) {
        return code;
    }
    const Model *m = modelOf(ch);
    if (m == nullptr || info == nullptr || (mode != 0 && mode != 2)) {
        return kErrBadArgument;
    }
    if (run >= m->chunks.size()) {
        return kErrNotFound;
    }
    const uint32_t first = makeId(run, 0);
    if (mode == 0) {
        fill(info, run, first, lastItemOfChunk(*m, run));
    } else {
        fill(info, run, first, first + m->chunks[run].charCount - 1);
    }
    return 0;
}

// field1: the section's first item id; field2: its id; field3: the id of the last item
// of its last chunk.
uint32_t CHGetSectionInfo(CHHandle ch, uint32_t section, CHSectionInfo *info) {
    uint32_t code;
    if (failing(Fn::CHGetSectionInfo, code)) {
        return code;
    }
    const Model *m = modelOf(ch);
    if (m == nullptr || info == nullptr) {
        return kErrBadArgument;
    }
    if (section >= m->sections.size()) {
        return kErrNotFound;
    }
    const antk::detail::SectionRec &sec = m->sections[section];
    fill(info, makeId(sec.firstChunk, 0), antk::kSectionIdBase + section,
         lastItemOfChunk(*m, sec.lastChunk));
    return 0;
}

}  // extern "C"
