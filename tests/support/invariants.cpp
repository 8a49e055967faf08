#include "support/invariants.h"

#include <map>
#include <sstream>
#include <utility>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "support/fixture.h"

namespace annotest {

namespace {

std::string Str(const ANPos &pos) { return ::testing::PrintToString(pos); }

int Compare(const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b); }

}  // namespace

const ANEntryTable *TableOf(DAHandle doc) {
    const auto *instance = static_cast<const ANInstance *>(antk::annoSlot(doc));
    return instance == nullptr ? nullptr : instance->entries;
}

std::vector<Listed> ListedEntries(DAHandle doc) {
    std::vector<Listed> out;
    const ANEntryTable *table = TableOf(doc);
    if (table == nullptr) return out;
    uint32_t steps = 0;
    for (uint16_t i = table->first; i != AN_NONE && steps <= table->capacity;
         i = ANSlot(table, i).next, ++steps) {
        const ANEntry &entry = ANSlot(table, i);
        Listed listed{i, entry.type, entry.flags, entry.record, {}};
        if (entry.type == AN_TYPE_TEXT && entry.record.textBuffer != nullptr) {
            listed.text.assign(reinterpret_cast<const char16_t *>(entry.record.textBuffer),
                               entry.record.textLength);
        }
        out.push_back(listed);
    }
    return out;
}

std::u16string AnchorText(DAHandle doc, const ANPos &anchor, char16_t placeholder) {
    std::u16string text;
    for (const Listed &e : ListedEntries(doc)) {
        if (e.record.start.itemId != anchor.itemId ||
            e.record.start.subItemId != anchor.subItemId) {
            continue;
        }
        if (e.type == AN_TYPE_TEXT) text += e.text;
        if (e.type == AN_TYPE_PLACEHOLDER) text += placeholder;
    }
    return text;
}

::testing::AssertionResult TableInvariantsHold(DAHandle doc) {
    const ANEntryTable *t = TableOf(doc);
    if (t == nullptr) return ::testing::AssertionSuccess();
    const uint32_t capacity = t->capacity;
    if (capacity == 0 || capacity % ANTABLE_GROWTH != 0 || capacity > ANTABLE_MAX_CAPACITY) {
        return ::testing::AssertionFailure() << "capacity " << capacity;
    }
    std::vector<int> seen(capacity, 0);  // 1 ordered list, 2 free list

    // Walks one list, checking links; returns the number of slots met.
    auto walk = [&](uint16_t head, uint16_t tail, int mark, const char *name,
                    uint32_t *length) -> ::testing::AssertionResult {
        uint16_t before = AN_NONE;
        *length = 0;
        for (uint16_t i = head; i != AN_NONE; i = ANSlot(t, i).next) {
            if (i >= capacity) {
                return ::testing::AssertionFailure() << name << ": slot " << i << " out of range";
            }
            if (seen[i] != 0) {
                return ::testing::AssertionFailure()
                       << name << ": slot " << i << " met twice or in both lists";
            }
            seen[i] = mark;
            if (ANSlot(t, i).prev != before) {
                return ::testing::AssertionFailure()
                       << name << ": slot " << i << " prev " << ANSlot(t, i).prev << ", expected "
                       << before;
            }
            before = i;
            ++*length;
        }
        if (before != tail) {
            return ::testing::AssertionFailure()
                   << name << ": ends at " << before << " but its tail field says " << tail;
        }
        return ::testing::AssertionSuccess();
    };

    uint32_t listed = 0;
    uint32_t free = 0;
    ::testing::AssertionResult r = walk(t->first, t->last, 1, "ordered list", &listed);
    if (!r) return r;
    r = walk(t->freeFirst, t->freeLast, 2, "free list", &free);
    if (!r) return r;
    if (listed + free != capacity) {
        return ::testing::AssertionFailure()
               << listed << " listed + " << free << " free slots != capacity " << capacity;
    }
    if (t->count != listed) {
        return ::testing::AssertionFailure()
               << "count " << t->count << " but " << listed << " entries listed";
    }
    if (free == 0) return ::testing::AssertionFailure() << "no free slot left";
    if (t->full != 0 && free != 1) {
        return ::testing::AssertionFailure() << "full set with " << free << " free slots";
    }

    bool text = false;
    const ANEntry *before = nullptr;
    uint32_t index = 0;
    for (uint16_t i = t->first; i != AN_NONE; i = ANSlot(t, i).next, ++index) {
        const ANEntry &e = ANSlot(t, i);
        if (e.type < AN_TYPE_HILITE || e.type > AN_TYPE_CUTMARK) {
            return ::testing::AssertionFailure() << "slot " << i << " has type " << e.type;
        }
        if (Compare(e.record.start, e.record.end) > 0) {
            return ::testing::AssertionFailure()
                   << "slot " << i << " (type " << e.type << ") starts at " << Str(e.record.start)
                   << " after its end " << Str(e.record.end);
        }
        if (before != nullptr && Compare(e.record.start, before->record.start) < 0) {
            return ::testing::AssertionFailure()
                   << "list entry " << index << " (slot " << i << ", type " << e.type
                   << ") starts at " << Str(e.record.start) << ", before the entry listed ahead ("
                   << Str(before->record.start) << ", type " << before->type << ")";
        }
        if (e.type == AN_TYPE_TEXT || e.type == AN_TYPE_PLACEHOLDER) text = true;
        if (e.type == AN_TYPE_TEXT) {
            const ANAnnoRecord &rec = e.record;
            if (rec.textBuffer == nullptr || rec.textCapacity % 64 != 0 ||
                rec.textCapacity <= rec.textLength || rec.text != nullptr) {
                return ::testing::AssertionFailure()
                       << "text entry in slot " << i << ": buffer " << rec.textBuffer << ", length "
                       << rec.textLength << ", capacity " << rec.textCapacity << ", caller text "
                       << rec.text;
            }
        }
        before = &e;
    }
    if (text && t->hasText == 0) return ::testing::AssertionFailure() << "hasText not set";
    return ::testing::AssertionSuccess();
}

::testing::AssertionResult TextLayoutHolds(DAHandle doc) {
    // Text entries per plain anchor, in list order.
    std::map<std::pair<uint32_t, uint32_t>, std::vector<Listed>> anchors;
    for (const Listed &e : ListedEntries(doc)) {
        if (e.type != AN_TYPE_TEXT && e.type != AN_TYPE_PLACEHOLDER) continue;
        anchors[{e.record.start.itemId, e.record.start.subItemId}].push_back(e);
    }
    for (const auto &[anchor, texts] : anchors) {
        uint32_t units = 0;
        for (size_t j = 0; j < texts.size(); ++j) {
            const Listed &e = texts[j];
            units += e.type == AN_TYPE_TEXT ? e.record.textLength : 1;
            const bool last = j + 1 == texts.size();
            const ANPos &s = e.record.start;
            const bool ok =
                last ? s.kind != ANPOS_ANNOTEXT : s.kind == ANPOS_ANNOTEXT && s.textIndex == units;
            if (!ok) {
                return ::testing::AssertionFailure()
                       << "text entry " << j << " of " << texts.size() << " at anchor ("
                       << anchor.first << ", " << anchor.second << ") in slot " << e.slot
                       << " starts at " << Str(s) << " after " << units << " units";
            }
            ANPos step = s;
            if (s.kind == ANPOS_ANNOTEXT) {
                step.textIndex++;
            } else {
                step.subItemId++;
            }
            if (!(e.record.end == step)) {
                return ::testing::AssertionFailure()
                       << "text entry in slot " << e.slot << " ends at " << Str(e.record.end);
            }
        }
    }
    return ::testing::AssertionSuccess();
}

}  // namespace annotest
