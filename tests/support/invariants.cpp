#include "support/invariants.h"

#include <map>
#include <sstream>
#include <utility>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "support/fixture.h"
#include "support/table_rules.h"

namespace annotest {

namespace {

std::string Str(const ANPos &pos) { return ::testing::PrintToString(pos); }

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
    const std::string broken = TableRulesBroken(TableOf(doc));
    if (broken.empty()) return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure() << broken;
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
