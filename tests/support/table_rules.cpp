#include "support/table_rules.h"

#include <cstdio>
#include <vector>

#include "anno/toolkit.h"
#include "binding/instance.h"

namespace annotest {

namespace {

int Compare(const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b); }

// Walks one list from `head`, marking its slots in `seen` with `mark`; checks the
// links and that it ends at `tail`. Empty on success.
std::string WalkList(const ANEntryTable *t, uint16_t head, uint16_t tail, int mark,
                     const char *name, std::vector<int> &seen, uint32_t *length) {
    uint16_t before = AN_NONE;
    *length = 0;
    for (uint16_t i = head; i != AN_NONE; i = ANSlot(t, i).next) {
        if (i >= t->capacity) {
            return std::string(name) + ": slot " + std::to_string(i) + " out of range";
        }
        if (seen[i] != 0) {
            return std::string(name) + ": slot " + std::to_string(i) +
                   " met twice or in both lists";
        }
        seen[i] = mark;
        if (ANSlot(t, i).prev != before) {
            return std::string(name) + ": slot " + std::to_string(i) + " prev " +
                   std::to_string(ANSlot(t, i).prev) + ", expected " + std::to_string(before);
        }
        before = i;
        ++*length;
    }
    if (before != tail) {
        return std::string(name) + ": ends at " + std::to_string(before) +
               " but its tail field says " + std::to_string(tail);
    }
    return {};
}

}  // namespace

std::string PosText(const ANPos &pos) {
    char sub[16] = "-";
    if (pos.subItemId != ANPOS_NOSUBITEM)
        std::snprintf(sub, sizeof sub, "%u", static_cast<unsigned>(pos.subItemId));
    char out[64];
    std::snprintf(out, sizeof out, "(%u, %s, %u, %u)", static_cast<unsigned>(pos.itemId), sub,
                  static_cast<unsigned>(pos.kind), static_cast<unsigned>(pos.textIndex));
    return out;
}

std::string TableRulesBroken(const ANEntryTable *t) {
    if (t == nullptr) return {};
    const uint32_t capacity = t->capacity;
    if (capacity == 0 || capacity % ANTABLE_GROWTH != 0 || capacity > ANTABLE_MAX_CAPACITY) {
        return "capacity " + std::to_string(capacity);
    }
    std::vector<int> seen(capacity, 0);  // 1 ordered list, 2 free list
    uint32_t listed = 0;
    uint32_t free = 0;
    std::string why = WalkList(t, t->first, t->last, 1, "ordered list", seen, &listed);
    if (!why.empty()) return why;
    why = WalkList(t, t->freeFirst, t->freeLast, 2, "free list", seen, &free);
    if (!why.empty()) return why;
    if (listed + free != capacity) {
        return std::to_string(listed) + " listed + " + std::to_string(free) +
               " free slots != capacity " + std::to_string(capacity);
    }
    if (t->count != listed) {
        return "count " + std::to_string(t->count) + " but " + std::to_string(listed) +
               " entries listed";
    }
    if (free == 0) return "no free slot left";
    if (t->full != 0 && free != 1) return "full set with " + std::to_string(free) + " free slots";

    bool text = false;
    const ANEntry *before = nullptr;
    uint32_t index = 0;
    for (uint16_t i = t->first; i != AN_NONE; i = ANSlot(t, i).next, ++index) {
        const ANEntry &e = ANSlot(t, i);
        const std::string slot = "slot " + std::to_string(i) + " (type " + std::to_string(e.type);
        if (e.type < AN_TYPE_HILITE || e.type > AN_TYPE_CUTMARK) return slot + ") bad type";
        if (Compare(e.record.start, e.record.end) > 0) {
            return slot + ") starts at " + PosText(e.record.start) + " after its end " +
                   PosText(e.record.end);
        }
        if (before != nullptr && Compare(e.record.start, before->record.start) < 0) {
            return "list entry " + std::to_string(index) + ", " + slot + "), starts at " +
                   PosText(e.record.start) + ", before the entry listed ahead (" +
                   PosText(before->record.start) + ", type " + std::to_string(before->type) + ")";
        }
        if (e.type == AN_TYPE_TEXT || e.type == AN_TYPE_PLACEHOLDER) text = true;
        if (e.type == AN_TYPE_TEXT) {
            const ANAnnoRecord &rec = e.record;
            if (rec.textBuffer == nullptr || rec.textCapacity % 64 != 0 ||
                rec.textCapacity <= rec.textLength || rec.text != nullptr) {
                return "text entry in slot " + std::to_string(i) + ": buffer " +
                       (rec.textBuffer == nullptr ? "null" : "set") + ", length " +
                       std::to_string(rec.textLength) + ", capacity " +
                       std::to_string(rec.textCapacity) + ", caller text " +
                       (rec.text == nullptr ? "null" : "kept");
            }
        }
        before = &e;
    }
    if (text && t->hasText == 0) return "hasText not set";
    return {};
}

std::string DocumentRulesBroken(DAHandle doc) {
    const auto *instance = static_cast<const ANInstance *>(antk::annoSlot(doc));
    if (instance == nullptr) return {};
    const ANEntryTable *t = instance->entries;
    std::string why = TableRulesBroken(t);
    if (!why.empty()) return why;
    const uint16_t hover = instance->hoverEntry;
    if (hover == AN_NONE) return {};
    if (t == nullptr) return "hover entry " + std::to_string(hover) + " without a table";
    for (uint16_t i = t->first; i != AN_NONE; i = ANSlot(t, i).next) {
        if (i == hover) return {};
    }
    return "hover entry " + std::to_string(hover) + " is not in the ordered list";
}

}  // namespace annotest
