#include "support/table_view.h"

#include <cstdio>
#include <cstring>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "hosts/modules.h"
#include "hosts/platform.h"
#include "store/table.h"

#if defined(_WIN32)
#include <windows.h>

#include <atomic>
#include <utility>

// On Windows the library takes its memory from the system itself. Its live blocks are
// counted by sending anno.dll's imports of the allocation functions (its import address
// table) through counting wrappers, so that only the library's blocks count.
namespace {
std::atomic<int64_t> gHeap{0}, gGlobal{0};
template <typename T>
T Counted(std::atomic<int64_t> &count, T block) {
    return count += block != nullptr, block;
}
LPVOID WINAPI HeapAllocCounted(HANDLE h, DWORD f, SIZE_T n) {
    return Counted(gHeap, HeapAlloc(h, f, n));
}
BOOL WINAPI HeapFreeCounted(HANDLE h, DWORD f, LPVOID b) {
    return gHeap -= b != nullptr, HeapFree(h, f, b);
}
HGLOBAL WINAPI GlobalAllocCounted(UINT f, SIZE_T n) { return Counted(gGlobal, GlobalAlloc(f, n)); }
HGLOBAL WINAPI GlobalFreeCounted(HGLOBAL b) { return gGlobal -= b != nullptr, GlobalFree(b); }
bool CountLibraryBlocks() {
    auto *base = reinterpret_cast<BYTE *>(GetModuleHandleA("anno.dll"));
    if (base == nullptr) return false;
    const auto *nt = reinterpret_cast<const IMAGE_NT_HEADERS *>(
        base + reinterpret_cast<const IMAGE_DOS_HEADER *>(base)->e_lfanew);
    const DWORD imports =
        nt->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_IMPORT].VirtualAddress;
    const std::pair<const char *, void *> wrappers[] = {
        {"HeapAlloc", reinterpret_cast<void *>(&HeapAllocCounted)},
        {"HeapFree", reinterpret_cast<void *>(&HeapFreeCounted)},
        {"GlobalAlloc", reinterpret_cast<void *>(&GlobalAllocCounted)},
        {"GlobalFree", reinterpret_cast<void *>(&GlobalFreeCounted)}};
    for (auto *d = reinterpret_cast<IMAGE_IMPORT_DESCRIPTOR *>(base + imports); d->Name; ++d) {
        auto *name = reinterpret_cast<IMAGE_THUNK_DATA *>(base + d->OriginalFirstThunk);
        for (auto *slot = reinterpret_cast<IMAGE_THUNK_DATA *>(base + d->FirstThunk);
             name->u1.AddressOfData != 0; ++name, ++slot) {
            const auto *fn =
                reinterpret_cast<IMAGE_IMPORT_BY_NAME *>(base + name->u1.AddressOfData);
            for (const auto &[wanted, wrapper] : wrappers) {
                if (IMAGE_SNAP_BY_ORDINAL(name->u1.Ordinal) || std::strcmp(fn->Name, wanted))
                    continue;
                DWORD was = 0;
                VirtualProtect(&slot->u1.Function, sizeof(void *), PAGE_READWRITE, &was);
                slot->u1.Function = reinterpret_cast<ULONG_PTR>(wrapper);
                VirtualProtect(&slot->u1.Function, sizeof(void *), was, &was);
            }
        }
    }
    return true;
}
}  // namespace

namespace annotest {
int64_t HeapBlocks() {
    static const bool counting = CountLibraryBlocks();
    return counting ? gHeap.load() : 0;
}
int64_t GlobalBlocks() { return HeapBlocks(), gGlobal.load(); }
}  // namespace annotest
#else
#include "anno/winapi_test.h"
namespace annotest {
int64_t HeapBlocks() { return anwin::heapBlocks(); }
int64_t GlobalBlocks() { return anwin::globalBlocks(); }
}  // namespace annotest
#endif

namespace annotest {

namespace {

const ANInstance *InstanceOf(DAHandle doc) {
    return static_cast<const ANInstance *>(antk::annoSlot(doc));
}

const ANEntryTable *TableOf(DAHandle doc) {
    return InstanceOf(doc) ? InstanceOf(doc)->entries : nullptr;
}

// Walks one list from `head`, marking its slots in `seen` with `mark`; checks the
// links and that it ends at `tail`. Empty on success.
std::string WalkList(const ANEntryTable *t, uint16_t head, uint16_t tail, int mark,
                     const char *name, std::vector<int> &seen, uint32_t *length) {
    uint16_t before = AN_NONE;
    *length = 0;
    for (uint16_t i = head; i != AN_NONE; i = ANSlot(t, i).next) {
        auto slot = [&] { return std::string(name) + ": slot " + std::to_string(i); };
        if (i >= t->capacity) return slot() + " out of range";
        if (seen[i] != 0) return slot() + " met twice or in both lists";
        seen[i] = mark;
        if (ANSlot(t, i).prev != before) return slot() + " has a wrong prev link";
        before = i;
        ++*length;
    }
    if (before != tail) return std::string(name) + ": its tail field is wrong";
    return {};
}

std::string TableRulesBroken(const ANEntryTable *t) {
    const uint32_t capacity = t->capacity;
    if (capacity == 0 || capacity % ANTABLE_GROWTH != 0 || capacity > ANTABLE_MAX_CAPACITY)
        return "capacity " + std::to_string(capacity);
    std::vector<int> seen(capacity, 0);
    uint32_t listed = 0, free = 0;
    std::string why = WalkList(t, t->first, t->last, 1, "ordered list", seen, &listed);
    if (why.empty()) why = WalkList(t, t->freeFirst, t->freeLast, 2, "free list", seen, &free);
    if (!why.empty()) return why;
    if (listed + free != capacity) return "the lists do not cover every slot";
    if (t->count != listed)
        return "count " + std::to_string(t->count) + " is not the list's length";
    if (free == 0) return "no free slot left";
    if (t->full != 0 && free != 1) return "full set with " + std::to_string(free) + " free slots";
    bool text = false;
    const ANEntry *before = nullptr;
    for (uint16_t i = t->first; i != AN_NONE; i = ANSlot(t, i).next) {
        const ANEntry &e = ANSlot(t, i);
        auto slot = [&] {
            return "slot " + std::to_string(i) + ", type " + std::to_string(e.type);
        };
        if (e.type < AN_TYPE_HILITE || e.type > AN_TYPE_CUTMARK) return slot() + " has a bad type";
        if (ANCompPos(&e.record.start, &e.record.end) > 0) return slot() + " starts after its end";
        if (before != nullptr && ANCompPos(&e.record.start, &before->record.start) < 0)
            return slot() + " starts at " + PosText(e.record.start) + ", before the entry ahead";
        text |= e.type == AN_TYPE_TEXT || e.type == AN_TYPE_PLACEHOLDER;
        const ANAnnoRecord &r = e.record;
        if (e.type == AN_TYPE_TEXT &&
            (r.textBuffer == nullptr || r.textCapacity <= r.textLength || r.text != nullptr)) {
            return slot() + " does not own a text buffer longer than its text";
        }
        before = &e;
    }
    if (text && t->hasText == 0) return "hasText not set";
    return {};
}

}  // namespace

std::vector<Entry> ListEntries(DAHandle doc) {
    std::vector<Entry> out;
    const ANEntryTable *table = TableOf(doc);
    if (table == nullptr) return out;
    uint32_t steps = 0;
    for (uint16_t i = table->first; i != AN_NONE && steps <= table->capacity;
         i = ANSlot(table, i).next, ++steps) {
        const ANEntry &e = ANSlot(table, i);
        Entry entry{i, e.type, (e.flags & ANENTRY_OWNS_USERDATA) != 0, e.record, {}};
        if (e.type == AN_TYPE_TEXT && e.record.textBuffer != nullptr) {
            entry.text.assign(reinterpret_cast<const char16_t *>(e.record.textBuffer),
                              e.record.textLength);
        }
        out.push_back(entry);
    }
    return out;
}

bool HasTable(DAHandle doc) { return TableOf(doc) != nullptr; }

std::vector<uint64_t> KeptBlocks(DAHandle doc) {
    const ANInstance *in = InstanceOf(doc);
    return in ? std::vector<uint64_t>(in->orphans, in->orphans + in->orphanCount)
              : std::vector<uint64_t>{};
}

std::vector<uint8_t> TableBytes(DAHandle doc) {
    const ANEntryTable *table = TableOf(doc);
    if (table == nullptr) return {};
    const auto *bytes = reinterpret_cast<const uint8_t *>(table);
    return std::vector<uint8_t>(bytes, bytes + ANTableBytes(table->capacity));
}

uint16_t HoverEntry(DAHandle doc, ANPos *pos) {
    const ANInstance *in = InstanceOf(doc);
    *pos = in != nullptr ? in->hoverPos : ANPos{};
    return in != nullptr ? in->hoverEntry : AN_NONE;
}

uint32_t BuildCursor(DAHandle doc) { return InstanceOf(doc) ? InstanceOf(doc)->buildCursor : 0; }

std::string DocumentRulesBroken(DAHandle doc) {
    const ANInstance *instance = InstanceOf(doc);
    if (instance == nullptr) return {};
    const std::string why = instance->entries ? TableRulesBroken(instance->entries) : "";
    if (!why.empty() || instance->hoverEntry == AN_NONE) return why;
    for (const Entry &e : ListEntries(doc))
        if (e.slot == instance->hoverEntry) return {};
    return "hover entry " + std::to_string(instance->hoverEntry) + " is not listed";
}

std::u16string AnchorText(const std::vector<Entry> &list, const ANPos &anchor,
                          char16_t placeholder) {
    std::u16string text;
    for (const Entry &e : list) {
        if (e.record.start.itemId != anchor.itemId || e.record.start.subItemId != anchor.subItemId)
            continue;
        if (e.type == AN_TYPE_TEXT) text += e.text;
        if (e.type == AN_TYPE_PLACEHOLDER) text += placeholder;
    }
    return text;
}

uint64_t NewHeapBlock(size_t bytes) {
    void *block = HeapAlloc(GetProcessHeap(), 0, bytes);
#if defined(_WIN32)
    gHeap += block != nullptr;  // the library may free it
#endif
    return static_cast<uint64_t>(reinterpret_cast<uintptr_t>(block));
}

void FreeHeapBlock(uint64_t block) {
#if defined(_WIN32)
    gHeap -= block != 0;
#endif
    HeapFree(GetProcessHeap(), 0, reinterpret_cast<void *>(static_cast<uintptr_t>(block)));
}

std::string PosText(const ANPos &pos) {
    char sub[16] = "-";
    if (pos.subItemId != ANPOS_NOSUBITEM) std::snprintf(sub, sizeof sub, "%u", pos.subItemId);
    char out[64];
    std::snprintf(out, sizeof out, "(%u, %s, %u, %u)", pos.itemId, sub, pos.kind, pos.textIndex);
    return out;
}

void HookContentReads(const std::function<void(ContentPiece &)> &edit) {
    if (!edit) return antk::setContentReadHook(nullptr);
    antk::setContentReadHook([edit](CAReadRecord *r) {
        auto *buffer = static_cast<unsigned char *>(r->buffer);
        ContentPiece p{r->type, r->flags, r->room, r->charCount, r->charSet, r->written, buffer};
        edit(p);
    });
}

}  // namespace annotest
