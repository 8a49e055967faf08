// The fuzz target: decodes its input into two toolkit documents (chunks, text items,
// cut items, skipped items, document ranges), a global style table, and a sequence of
// calls over all 28 exports, made as a viewer would make them and as a careless one
// might. After every operation the table rules hold for both documents, read-only
// operations leave the tables as they were, and the answers of tracking walks, text
// reads, events, searches, stepping, styles, clearing and copying are held against
// brute-force readings of the table. At the end of an input every heap and global
// block is back and no secondary document or content is open.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <map>
#include <set>
#include <string>
#include <tuple>
#include <vector>

#include "anno/anno.h"
#include "anno/toolkit.h"
#include "fuzz_support.h"
#include "oracles.h"

#if !defined(_WIN32)
#include "anno/winapi_test.h"
#define ANNO_FUZZ_PLATFORM_CONTROLS 1
#else
#define ANNO_FUZZ_PLATFORM_CONTROLS 0
#endif

namespace annofuzz {

uint64_t apiCalls = 0;
Settings settings;

namespace {

uint64_t inputs = 0;
std::string context;
std::vector<std::string> trail;  // the operations of the current input

void PrintCounts() {
    std::fprintf(stderr, "anno_fuzz: %llu API calls over %llu inputs\n",
                 static_cast<unsigned long long>(apiCalls),
                 static_cast<unsigned long long>(inputs));
}

const bool registered = [] { return std::atexit(PrintCounts) == 0; }();

}  // namespace

void SetContext(const std::string &what) { context = what; }

void Fail(const std::string &what) {
    std::fprintf(stderr, "\nanno_fuzz: FAILED: %s\n  while: %s\n  operations of this input:\n",
                 what.c_str(), context.c_str());
    for (const std::string &op : trail) std::fprintf(stderr, "    %s\n", op.c_str());
    std::fflush(stderr);
    std::abort();
}

std::string Text(const ANPos &pos) { return annotest::PosText(pos); }

SlotIndex::SlotIndex(const std::vector<Entry> &list) {
    for (size_t i = 0; i < list.size(); ++i) {
        if (list[i].slot >= at_.size()) at_.resize(list[i].slot + 1u, -1);
        at_[list[i].slot] = static_cast<int>(i);
    }
}

bool SameListing(const std::vector<Entry> &a, const std::vector<Entry> &b) {
    if (a.size() != b.size()) return false;
    for (size_t i = 0; i < a.size(); ++i) {
        if (a[i].slot != b[i].slot || a[i].type != b[i].type || a[i].text != b[i].text ||
            std::memcmp(&a[i].record, &b[i].record, sizeof(ANAnnoRecord)) != 0) {
            return false;
        }
    }
    return true;
}

namespace {

std::string N(uint64_t v) { return std::to_string(v); }

// ---- The documents -----------------------------------------------------------------

constexpr uint32_t kRangeCodes[] = {0x8003000C, 0x80020008, 0x84000010, 0x81000000, 0x82000000};

uint32_t RangeCode(Input &in) {
    const uint32_t pick = in.below(7);
    return pick < 5 ? kRangeCodes[pick] : in.u32();
}

// What the callback of one document heard, and what it answered.
struct Recorder {
    std::vector<Note> notes;
    uint32_t seed = 1;
};

uint32_t Notify(uint16_t code, uint16_t detail, void *record, void *data) {
    auto *recorder = static_cast<Recorder *>(data);
    Note note{};
    note.code = code;
    note.detail = detail;
    if (record != nullptr) {
        if (code == ANNOTIFY_EVENT) {
            std::memcpy(&note.event, record, sizeof note.event);
        } else {
            std::memcpy(&note.record, record, sizeof note.record);
        }
    }
    recorder->seed = recorder->seed * 1103515245u + 12345u;
    note.returned = recorder->seed >> 16;
    recorder->notes.push_back(note);
    return note.returned;
}

struct Document {
    DAHandle handle = nullptr;
    std::vector<antk::ItemView> items;
    std::vector<ANPos> content;  // content positions in walk order
    uint32_t ranges = 0;
    Recorder recorder;
    bool callback = false;
    std::set<uint64_t> blocks;  // userData blocks handed to this document, still live
    ANTrackInfo stale{};        // a tracking record kept across changes
    ANAnnoTextTrack staleText{};
    bool staleTextStarted = false;
};

bool Bound(const Document &d) { return antk::annoSlot(d.handle) != nullptr; }

DAHandle BuildDocument(Input &in, uint32_t maxItems, uint32_t *ranges) {
    antk::DocumentBuilder builder(2 + in.below(8));
    const uint32_t count = 1 + in.below(maxItems);
    std::vector<uint32_t> ids;
    std::vector<uint32_t> texts;
    for (uint32_t i = 0; i < count; ++i) {
        switch (in.below(13)) {
            case 0:
            case 1:
            case 2:
            case 3: {
                std::string chars(1 + in.below(4), 'a');
                for (char &c : chars) c = static_cast<char>('a' + in.below(26));
                texts.push_back(builder.textItem(std::string_view(chars)));
                ids.push_back(texts.back());
                break;
            }
            case 4:
                ids.push_back(builder.cutItem());
                break;
            case 5:
                ids.push_back(builder.skippedItem(antk::kItemSkip));
                break;
            case 6:
                ids.push_back(builder.skippedItem(antk::kItemSkip2));
                break;
            case 7:
                ids.push_back(builder.item(antk::kItemRangeEnd, RangeCode(in)));
                break;
            case 8:
                builder.newChunk();
                ids.push_back(builder.item(antk::kItemParagraph));
                break;
            case 9:
                builder.newSection();
                ids.push_back(builder.item(antk::kItemParagraph));
                break;
            case 10:
                ids.push_back(builder.item(0, in.below(3)));
                break;
            default:
                ids.push_back(builder.item(antk::kItemParagraph));
                break;
        }
    }
    *ranges = in.below(4);
    for (uint32_t r = 0; r < *ranges; ++r) builder.range(ids[in.below(ids.size())], RangeCode(in));
    if (!texts.empty() && in.chance(32)) {
        const uint32_t flags[] = {0, 0x10000, 0x100000, 0x120000};
        builder.hideItemText(texts[in.below(texts.size())], flags[in.below(4)]);
    }
    if (in.chance(64)) builder.option(0x10);
    return builder.build();
}

void Describe(Document &d) {
    d.items = antk::items(d.handle);
    d.content.clear();
    for (const antk::ItemView &item : d.items) {
        if (item.type == antk::kItemText && item.charCount > 0) {
            for (uint32_t c = 0; c < item.charCount; ++c) {
                d.content.push_back(ANPos{item.id, item.firstChar + c, 0, 0});
            }
        } else {
            d.content.push_back(ANPos{item.id, ANPOS_NOSUBITEM, 0, 0});
        }
    }
}

// ---- Choices -------------------------------------------------------------------------

uint32_t PickTag(Input &in) {
    static constexpr uint32_t kTags[] = {0, 1, 2, 3, 6, 7, 14, 0x80000001, 0x80000007, 0x80200000};
    const uint32_t pick = in.below(12);
    return pick < 10 ? kTags[pick] : in.u32();
}

// Plain anchors that carry annotation text, with the number of their units.
std::vector<std::pair<ANPos, uint32_t>> TextAnchors(const std::vector<Entry> &list) {
    std::vector<std::pair<ANPos, uint32_t>> out;
    for (const Entry &e : list) {
        if (e.type != AN_TYPE_TEXT && e.type != AN_TYPE_PLACEHOLDER) continue;
        const uint32_t units = e.type == AN_TYPE_TEXT ? e.record.textLength : 1;
        bool known = false;
        for (auto &[anchor, total] : out) {
            if (SameAnchor(anchor, e.record.start)) {
                total += units;
                known = true;
            }
        }
        if (!known) out.push_back({e.record.start, units});
    }
    return out;
}

ANPos PickPos(Input &in, const Document &d) {
    const uint32_t how = in.below(20);
    if (how < 9) {
        ANPos p = d.content[in.below(d.content.size())];
        if (how == 8) p.kind = in.chance(128) ? 4 : in.below(8), p.textIndex = in.below(4);
        return p;
    }
    if (how < 14) {
        // Inside annotation text: at an anchor that has some, or at any content position.
        const std::vector<std::pair<ANPos, uint32_t>> anchors = TextAnchors(ListEntries(d.handle));
        ANPos p = d.content[in.below(d.content.size())];
        uint32_t units = 0;
        if (!anchors.empty() && how < 13) {
            const auto &pick = anchors[in.below(anchors.size())];
            p = pick.first;
            units = pick.second;
        }
        p.kind = ANPOS_ANNOTEXT;
        p.textIndex = in.below(units + 2);
        return p;
    }
    if (how < 16) {
        // On an item, or one of its characters, or beyond the document's last item.
        const antk::ItemView &item = d.items[in.below(d.items.size())];
        ANPos p{item.id, ANPOS_NOSUBITEM, 0, 0};
        if (how == 15) p.itemId = d.items.back().id + 1 + in.below(3);
        if (in.chance(64)) p.subItemId = item.firstChar + in.below(6);
        return p;
    }
    if (how < 18) {
        const std::vector<Entry> list = ListEntries(d.handle);
        if (!list.empty()) {
            const Entry &e = list[in.below(list.size())];
            return in.chance(128) ? e.record.start : e.record.end;
        }
        return d.content.front();
    }
    ANPos p{in.below(4) == 0 ? in.u32() : in.below(0x30000),
            in.chance(128) ? ANPOS_NOSUBITEM : in.u32(), in.chance(200) ? in.below(8) : in.u32(),
            in.below(8)};
    return p;
}

// The positions a viewer's walk meets, from the document's first content position:
// empty when stepping failed to move forward (a finding of its own).
std::vector<ANPos> WalkPositions(const Document &d, bool check);

// ---- The run of one input -----------------------------------------------------------

class Run {
 public:
    explicit Run(Input &in) : in_(in) {}
    void Go();

 private:
    Document &Pick() { return in_.chance(200) ? a_ : b_; }
    void CheckRules(const char *when);
    void CheckOwnership(Document &d);
    void Bind(Document &d, bool callback);

    // The operations.
    void Add(Document &d);
    void AddBad(Document &d);
    void CheckAdded(Document &d, uint16_t type, const ANPos &at, const std::vector<Entry> &before,
                    const std::vector<uint16_t> &text, const ANAnnoRecord *heard);
    void Clear(Document &d);
    void ClearUserData(Document &d);
    void Track(Document &d);
    void TextReads(Document &d);
    void Event(Document &d);
    void Find(Document &d);
    void Map(Document &d);
    void Styles(Document &d);
    void Copy();
    void Build(Document &d);
    void Step(Document &d);
    void Compare(Document &d);
    void Callback(Document &d);
    void Lifecycle(Document &d);
    void Stale(Document &d);
    void ArmFailure();
    void Fill(Document &d);
    void Finish();

    uint64_t NewBlock(Document &d);

    Input &in_;
    Document a_;
    Document b_;
    ANStyleTable *global_ = nullptr;
    bool faulty_ = false;  // a failure is armed for this operation
    bool armNext_ = false;
    // The failure ArmFailure chose, armed when the next operation begins.
    uint32_t pendingAllocation = 0;
    bool pendingSticky = false;
    uint32_t pendingCall = 0;
    uint32_t pendingCode = 0;
    bool pendingCallSticky = false;
#if ANNO_FUZZ_PLATFORM_CONTROLS
    int64_t heapAtStart_ = 0;
    int64_t globalAtStart_ = 0;
#endif
};

void Run::CheckRules(const char *when) {
    for (Document *d : {&a_, &b_}) {
        const std::string broken = annotest::DocumentRulesBroken(d->handle);
        if (!broken.empty()) Fail(std::string("table rules after ") + when + ": " + broken);
        CheckOwnership(*d);
    }
}

// Every entry that owns a userData block holds one this document was given.
void Run::CheckOwnership(Document &d) {
    for (const Entry &e : ListEntries(d.handle)) {
        if (!e.ownsUserData || e.record.userData == 0) continue;
        CHECK(e.type == AN_TYPE_HILITE || e.type == AN_TYPE_RANGE || e.type == AN_TYPE_TEXT,
              "a type-" + N(e.type) + " entry owns a userData block");
        CHECK(d.blocks.count(e.record.userData) != 0, "slot " + N(e.slot) + " owns userData " +
                                                          N(e.record.userData) +
                                                          " that no caller handed over");
    }
}

uint64_t Run::NewBlock(Document &d) {
    // Reuse a block already given to this document now and then: one block may be
    // shared by several annotations.
    if (!d.blocks.empty() && in_.chance(48)) {
        auto it = d.blocks.begin();
        std::advance(it, in_.below(d.blocks.size()));
        return *it;
    }
    const uint64_t value = annotest::NewHeapBlock(8 + in_.below(24));
    if (value == 0) return 0;
    d.blocks.insert(value);
    return value;
}

void Run::Bind(Document &d, bool callback) {
    d.callback = callback;
    const uint32_t rc = CALL(ANInit(d.handle, in_.chance(200) ? global_ : nullptr,
                                    callback ? Notify : nullptr, &d.recorder));
    if (!faulty_) CHECK(rc == 0 && Bound(d), "ANInit gave " + N(rc));
}

void Run::Go() {
    // ANNO_FUZZ_TRACE=1 prints each operation as it ends: what a hang was doing.
    static const bool trace = std::getenv("ANNO_FUZZ_TRACE") != nullptr;
    ++inputs;
    trail.clear();
    SetContext("setting up");
    antk::clearFailures();
#if ANNO_FUZZ_PLATFORM_CONTROLS
    anwin::clearFailures();
    heapAtStart_ = anwin::heapBlocks();
    globalAtStart_ = anwin::globalBlocks();
#endif
    a_.handle = BuildDocument(in_, 24, &a_.ranges);
    b_.handle = BuildDocument(in_, 8, &b_.ranges);
    Describe(a_);
    Describe(b_);
    if (in_.chance(220)) {
        CHECK(CALL(ANInitGlobalHiliteStyles(&global_)) == 0, "making a global style table");
        const uint32_t styles = in_.below(12);
        for (uint32_t i = 0; i < styles; ++i) {
            ANHiliteStyle s{in_.chance(200) ? ANHILITESTYLE_SIZE : ANHILITESTYLE_SIZE_OLD,
                            1 + in_.below(10),
                            in_.below(8),
                            in_.u32() & 0xFFFFFF,
                            in_.u32() & 0xFFFFFF,
                            static_cast<uint16_t>(in_.u16()),
                            static_cast<uint16_t>(in_.u16()),
                            0};
            CHECK(CALL(ANAddGlobalHiliteStyle(global_, &s)) == 0, "adding a global style");
        }
    }
    Bind(a_, in_.chance(220));
    Bind(b_, in_.chance(160));
    for (Document *d : {&a_, &b_}) {
        d->staleTextStarted = CALL(ANStartAnnoTextTrack(d->handle, &d->staleText)) == 0;
        std::memset(&d->stale, 0, sizeof d->stale);
    }
    Fill(a_);
    if (settings.arm) settings.arm();

    for (uint32_t ops = 0; !in_.done() && ops < 64; ++ops) {
        faulty_ = armNext_ || settings.sweep;
        armNext_ = false;
        if (faulty_) {
#if ANNO_FUZZ_PLATFORM_CONTROLS
            if (pendingAllocation != 0) anwin::failAllocation(pendingAllocation, pendingSticky);
#endif
            if (pendingCall != 0) antk::failAnyCall(pendingCall, pendingCode, pendingCallSticky);
            pendingAllocation = 0;
            pendingCall = 0;
        }
        const uint32_t op = in_.below(40);
        Document &d = Pick();
        trail.push_back("op " + N(op) + (&d == &a_ ? " on A" : " on B") +
                        (faulty_ ? " with a failure armed" : ""));
        SetContext(trail.back());
        a_.recorder.notes.clear();
        b_.recorder.notes.clear();
        if (op < 14) {
            Add(d);
        } else if (op < 15) {
            AddBad(d);
        } else if (op < 18) {
            Clear(d);
        } else if (op < 19) {
            ClearUserData(d);
        } else if (op < 22) {
            Track(d);
        } else if (op < 24) {
            TextReads(d);
        } else if (op < 26) {
            Event(d);
        } else if (op < 28) {
            Find(d);
        } else if (op < 29) {
            Map(d);
        } else if (op < 31) {
            Styles(d);
        } else if (op < 32) {
            Copy();
        } else if (op < 33) {
            Build(d);
        } else if (op < 34) {
            Step(d);
        } else if (op < 35) {
            Compare(d);
        } else if (op < 36) {
            Callback(d);
        } else if (op < 37) {
            Lifecycle(d);
        } else if (op < 38) {
            Stale(d);
        } else {
            ArmFailure();
        }
        antk::clearFailures();
#if ANNO_FUZZ_PLATFORM_CONTROLS
        anwin::clearFailures();
#endif
        CheckRules(trail.back().c_str());
        if (trace) {
            std::fprintf(stderr, "anno_fuzz: done %s\n", trail.back().c_str());
            for (const Document *doc : {&a_, &b_}) {
                for (const Entry &e : ListEntries(doc->handle)) {
                    std::fprintf(stderr, "    %s slot %u type %u tag %u %s to %s\n",
                                 doc == &a_ ? "A" : "B", e.slot, e.type, e.record.tag,
                                 Text(e.record.start).c_str(), Text(e.record.end).c_str());
                }
            }
        }
    }
    Finish();
}

// ---- Adding ----------------------------------------------------------------------------

void PutPos(uint8_t *desc, size_t offset, const ANPos &p) {
    std::memcpy(desc + offset, &p, sizeof p);
}
void Put32(uint8_t *desc, size_t offset, uint32_t v) { std::memcpy(desc + offset, &v, sizeof v); }
void Put64(uint8_t *desc, size_t offset, uint64_t v) { std::memcpy(desc + offset, &v, sizeof v); }

uint32_t StyleWord(Input &in) {
    const uint32_t bits = in.u32();
    if (in.chance(100)) return ANSTYLEWORD_NUMBER | (bits & 0xBFFF0000u) | (1 + in.below(12));
    return bits & ~ANSTYLEWORD_NUMBER;
}

void Run::Add(Document &d) {
    const uint16_t type = static_cast<uint16_t>(1 + in_.below(7));
    alignas(8) uint8_t desc[136] = {};
    uint32_t size = 0;
    const uint32_t tag = PickTag(in_);
    const ANPos start = PickPos(in_, d);
    const ANPos end = PickPos(in_, d);
    const bool blockType = type == AN_TYPE_HILITE || type == AN_TYPE_RANGE || type == AN_TYPE_TEXT;
    uint64_t userData = in_.chance(128) ? in_.u32() : 0;
    std::vector<uint16_t> text(in_.below(6));
    for (uint16_t &u : text) u = static_cast<uint16_t>('A' + in_.below(26));
    const uint16_t *textPointer = text.data();
    if (text.empty() && in_.chance(128)) textPointer = nullptr;
    if (!text.empty() && in_.chance(4)) textPointer = nullptr;  // refused with 15
    bool wideUserData = true;
    switch (type) {
        case AN_TYPE_HILITE: {
            static constexpr uint32_t kSizes[] = {72, 60, 48};
            size = kSizes[in_.below(3)];
            PutPos(desc, 8, start);
            PutPos(desc, 24, end);
            Put32(desc, 40, in_.u32() & 0x3F);
            const uint32_t style = StyleWord(in_);
            if (size == 72) {
                Put64(desc, 56, in_.u32());
                Put32(desc, 64, style);
            } else if (size == 60) {
                wideUserData = false;
                Put32(desc, 56, style);
            } else {
                wideUserData = false;
                Put32(desc, 44, style);
            }
            break;
        }
        case AN_TYPE_POINT:
        case AN_TYPE_VALUE: {
            static constexpr uint32_t kSizes[] = {72, 64, 32};
            size = kSizes[in_.below(type == AN_TYPE_POINT ? 3 : 2)];
            if (size == 32) {
                Put32(desc, 8, start.itemId);
                Put32(desc, 16, in_.u32() & 0x3F);
                Put64(desc, 24, in_.u32());
                userData = 0;
            } else {
                PutPos(desc, 8, start);
                PutPos(desc, 24, end);
                Put32(desc, 40, in_.u32() & 0x3F);
                Put64(desc, size == 72 ? 56 : 56, in_.u32());
                if (size == 72) Put64(desc, 64, in_.u32());
                wideUserData = size == 72;
            }
            break;
        }
        case AN_TYPE_RANGE: {
            static constexpr uint32_t kSizes[] = {48, 44, 40};
            size = kSizes[in_.below(3)];
            PutPos(desc, 8, start);
            PutPos(desc, 24, end);
            wideUserData = size == 48;
            if (size == 40) userData = 0;
            break;
        }
        case AN_TYPE_TEXT:
            size = 48;
            PutPos(desc, 8, start);
            std::memcpy(desc + 32, &textPointer, sizeof textPointer);
            Put32(desc, 40, static_cast<uint32_t>(text.size()));
            break;
        default: {
            size = in_.chance(128) ? 32 : 28;
            PutPos(desc, 8, start);
            wideUserData = size == 32;
            break;
        }
    }
    Put32(desc, 0, size);
    Put32(desc, 4, tag);
    // Types 1, 3 and 5 hand a block over, or nothing; the others carry any value.
    if (blockType) userData = wideUserData && in_.chance(100) ? NewBlock(d) : 0;
    if (size != 32 || type != AN_TYPE_POINT) {
        const size_t at = type == AN_TYPE_HILITE || type == AN_TYPE_POINT || type == AN_TYPE_VALUE
                              ? (wideUserData ? 48 : 44)
                          : type == AN_TYPE_RANGE ? 40
                                                  : 24;
        if (wideUserData) {
            Put64(desc, at, userData);
        } else if (!(type == AN_TYPE_HILITE && size == 48) && type != AN_TYPE_RANGE) {
            Put32(desc, at, static_cast<uint32_t>(userData));
        } else if (type == AN_TYPE_RANGE && size == 44) {
            Put32(desc, at, static_cast<uint32_t>(userData));
        }
    }
    trail.back() +=
        ": add type " + N(type) + " size " + N(size) + " tag " + N(tag) + " " + Text(start) +
        (type == 1 || type == 3 || (type != 5 && size >= 64) ? " to " + Text(end) : "") +
        (type == AN_TYPE_TEXT ? " text " + N(text.size()) : "");

    const std::vector<Entry> before = ListEntries(d.handle);
    const uint32_t rc = CALL(ANAddAnno(d.handle, type, desc));
    const std::vector<Note> &notes = d.recorder.notes;
    if (rc != 0) {
        for (const Note &n : notes)
            CHECK(n.code != ANNOTIFY_ADDED, "notified though adding failed");
    } else if (d.callback) {
        CHECK(notes.size() == 1 && notes[0].code == ANNOTIFY_ADDED && notes[0].detail == type,
              N(notes.size()) + " notifications for one add");
        const ANAnnoRecord &r = notes[0].record;
        CHECK(r.tag == tag, "notified tag");
        CHECK(Cmp(r.start, r.end) <= 0, "notified record out of order");
        if (type != AN_TYPE_HILITE && type != AN_TYPE_RANGE) {
            CHECK(Same(r.start, r.end), "a point notified with an extent");
        }
        const uint32_t normalised = type == AN_TYPE_TEXT                                   ? 96
                                    : type == AN_TYPE_RANGE || type >= AN_TYPE_PLACEHOLDER ? 64
                                                                                           : 72;
        CHECK(r.size == normalised, "notified size " + N(r.size));
    } else {
        CHECK(notes.empty(), "notified without a callback");
    }
    if (faulty_) return;
    if (!Bound(d)) {
        CHECK(rc == AN_ERR_NOSTATE || rc == AN_ERR_BADARG, "adding without state gave " + N(rc));
        return;
    }
    if (rc == 0) CheckAdded(d, type, start, before, text, d.callback ? &notes[0].record : nullptr);
    if (type == AN_TYPE_TEXT && textPointer == nullptr && !text.empty()) {
        CHECK(rc == AN_ERR_BADARG, "a text at a null pointer gave " + N(rc));
    }
    CHECK(rc == 0 || rc == AN_ERR_BADARG, "adding gave " + N(rc));
    if (rc == AN_ERR_BADARG)
        CHECK(SameListing(before, ListEntries(d.handle)), "a refused add changed the table");
}

// What an add must have done: a point, a highlight or a cut marker is the one new entry,
// with the record the callback heard, and the others keep their order; text and placeholders go into the annotation text of their anchor where the position
// says, and the text of every other anchor stays as it was.
void Run::CheckAdded(Document &d, uint16_t type, const ANPos &at, const std::vector<Entry> &before,
                     const std::vector<uint16_t> &text, const ANAnnoRecord *heard) {
    const std::vector<Entry> after = ListEntries(d.handle);
    bool plain = at.kind == 0 || at.kind == ANPOS_ANNOTEXT;  // not a kind of the caller's own
    for (const Entry &e : before) plain &= e.record.start.kind == 0 || e.record.start.kind == 5;
    if ((type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER) && plain) {
        std::u16string inserted(text.begin(), text.end());
        if (type == AN_TYPE_PLACEHOLDER) inserted = u"\xFFFF";
        std::u16string expected = AnchorText(before, at);
        const size_t k = at.kind == ANPOS_ANNOTEXT ? at.textIndex : expected.size();
        CHECK(k <= expected.size(), "text went in outside its anchor's text");
        expected.insert(k, inserted);
        CHECK(AnchorText(after, at) == expected, "annotation text at " + Text(at) + " after adding");
        for (const Entry &e : before) {
            if (!SameAnchor(e.record.start, at))
                CHECK(AnchorText(after, e.record.start) == AnchorText(before, e.record.start),
                      "adding text changed the text at " + Text(e.record.start));
        }
        return;
    }
    if (type == AN_TYPE_RANGE || type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER || !heard)
        return;
    CHECK(after.size() == before.size() + 1, "adding made " + N(after.size() - before.size()));
    size_t i = 0;
    while (i < before.size() && after[i].slot == before[i].slot) ++i;
    const Entry &added = after[i];
    const ANAnnoRecord &r = added.record;
    CHECK(added.type == type && r.tag == heard->tag && Same(r.start, heard->start) &&
              r.eventMask == heard->eventMask && r.userData == heard->userData &&
              r.value == heard->value &&
              (type != AN_TYPE_HILITE || r.style == heard->style) &&
              (type != AN_TYPE_HILITE || Same(heard->start, heard->end) || Same(r.end, heard->end)),
          "the new entry is not what the callback heard");
    for (size_t j = i; j < before.size(); ++j)
        CHECK(after[j + 1].slot == before[j].slot, "adding moved other entries");
}

void Run::AddBad(Document &d) {
    alignas(8) uint8_t desc[136] = {};
    for (size_t i = 8; i < 40; ++i) desc[i] = in_.byte();
    uint16_t type = static_cast<uint16_t>(in_.below(9));
    if (type >= 1 && type <= 7) type = in_.chance(128) ? 0 : static_cast<uint16_t>(8 + in_.u16());
    uint32_t size = in_.below(129);
    Put32(desc, 0, size);
    const bool null = in_.chance(40);
    trail.back() += ": add with type " + N(type) + " size " + N(size) + (null ? " null" : "");
    const std::vector<uint8_t> before = TableBytes(d.handle);
    const uint32_t rc = CALL(ANAddAnno(d.handle, type, null ? nullptr : desc));
    CHECK(rc == AN_ERR_BADARG, "a bad type gave " + N(rc));
    CHECK(before == TableBytes(d.handle) && d.recorder.notes.empty(),
          "a refused add changed something");
}

// ---- Clearing ----------------------------------------------------------------------------

void Run::Clear(Document &d) {
    static constexpr uint16_t kFlags[] = {0, ANCLEAR_MASK, ANCLEAR_EQUAL,
                                          ANCLEAR_MASK | ANCLEAR_EQUAL};
    const uint16_t flags =
        in_.chance(230) ? kFlags[in_.below(4)] : static_cast<uint16_t>(in_.u16());
    const uint32_t value = PickTag(in_);
    trail.back() += ": clear flags " + N(flags) + " value " + N(value);
    auto selected = [&](uint32_t tag) {
        if (flags == 0) return (tag & ANTAG_PROTECTED) == 0;
        if ((flags & ANCLEAR_EQUAL) != 0) return tag == value;
        if ((flags & ANCLEAR_MASK) != 0) return (tag & value) == value;
        return false;
    };
    const std::vector<Entry> before = ListEntries(d.handle);
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    const uint32_t rc = CALL(ANClearAnnos(d.handle, flags, value));
    const std::vector<Entry> after = ListEntries(d.handle);
    const std::vector<Note> &notes = d.recorder.notes;
    for (const Note &n : notes) {
        CHECK(n.code == ANNOTIFY_REMOVED && selected(n.record.tag),
              "notification " + N(n.code) + " for tag " + N(n.record.tag));
    }
    if (faulty_) return;
    if (!Bound(d)) {
        CHECK(rc == AN_ERR_NOSTATE && notes.empty(), "clearing without state gave " + N(rc));
        return;
    }
    if (before.empty()) {
        CHECK(rc == 0 && notes.empty() && !HasTable(d.handle), "clearing nothing");
        return;
    }
    size_t chosen = 0;
    for (const Entry &e : before) chosen += selected(e.record.tag) ? 1 : 0;
    if (chosen == 0) {
        CHECK(rc == 0 && notes.empty() && bytes == TableBytes(d.handle),
              "a clear that selects nothing changed something");
        return;
    }
    for (const Entry &e : after)
        CHECK(!selected(e.record.tag), "slot " + N(e.slot) + " survived its clear");
    CHECK(notes.size() <= chosen,
          N(notes.size()) + " removals announced for " + N(chosen) + " selected");
    if (d.callback) {
        CHECK(!notes.empty(), "no removal announced");
        CHECK(rc == notes.back().returned,
              "result " + N(rc) + ", the last callback said " + N(notes.back().returned));
    } else {
        CHECK(rc == 0 && notes.empty(), "clearing without a callback gave " + N(rc));
    }
    if (after.empty()) CHECK(!HasTable(d.handle), "an emptied table was kept");
    // The annotation text at every anchor loses exactly the units of the removed texts.
    std::vector<ANPos> anchors;
    for (const Entry &e : before) {
        if (e.type == AN_TYPE_TEXT || e.type == AN_TYPE_PLACEHOLDER)
            anchors.push_back(e.record.start);
    }
    for (const ANPos &anchor : anchors) {
        std::u16string expected;
        for (const Entry &e : before) {
            if (!SameAnchor(e.record.start, anchor) || selected(e.record.tag)) continue;
            if (e.type == AN_TYPE_TEXT) expected += e.text;
            if (e.type == AN_TYPE_PLACEHOLDER) expected += u'\xFFFF';
        }
        CHECK(AnchorText(after, anchor) == expected,
              "annotation text at " + Text(anchor) + " after the clear");
    }
}

void Run::ClearUserData(Document &d) {
    trail.back() += ": clear userData";
    std::set<uint64_t> owned;
    for (const Entry &e : ListEntries(d.handle)) {
        if (e.ownsUserData && e.record.userData != 0)
            owned.insert(e.record.userData);
    }
    const uint32_t rc = CALL(ANClearUserData(d.handle));
    std::set<uint64_t> still;
    for (const Entry &e : ListEntries(d.handle)) {
        if (e.ownsUserData && e.record.userData != 0)
            still.insert(e.record.userData);
    }
    for (uint64_t block : owned) {
        if (still.count(block) == 0) d.blocks.erase(block);
    }
    if (faulty_) return;
    CHECK(rc == 0, "ANClearUserData gave " + N(rc));
    CHECK(still.empty(), "blocks still owned after ANClearUserData");
}

// ---- Walks ----------------------------------------------------------------------------------

std::vector<ANPos> WalkPositions(const Document &d, bool check) {
    std::vector<ANPos> out;
    ANPos p = d.content.front();
    out.push_back(p);
    const std::vector<Entry> list = ListEntries(d.handle);
    size_t units = 0;
    for (const Entry &e : list) units += e.type == AN_TYPE_TEXT ? e.record.textLength : 1;
    const size_t bound = d.content.size() + units + 16;
    for (;;) {
        ANPos next{};
        const uint32_t rc = CALL(ANNextPos(d.handle, &p, &next));
        if (rc != 0) {
            if (check) CHECK(rc == AN_ERR_NOTFOUND, "ANNextPos gave " + N(rc));
            break;
        }
        if (check) {
            CHECK(Cmp(next, p) > 0, "ANNextPos went from " + Text(p) + " back to " + Text(next));
            CHECK(out.size() <= bound, "the walk does not end");
        } else if (Cmp(next, p) <= 0 || out.size() > bound) {
            break;
        }
        out.push_back(next);
        p = next;
    }
    return out;
}

void Run::Track(Document &d) {
    std::vector<ANPos> positions = WalkPositions(d, false);
    for (const Entry &e : ListEntries(d.handle)) {
        positions.push_back(e.record.start);
        positions.push_back(e.record.end);
    }
    const uint32_t extra = in_.below(4);
    for (uint32_t i = 0; i < extra; ++i) positions.push_back(PickPos(in_, d));
    std::stable_sort(positions.begin(), positions.end(),
                     [](const ANPos &x, const ANPos &y) { return Cmp(x, y) < 0; });
    const size_t from = in_.below(positions.size());
    const uint32_t skip = in_.below(4);  // in quarters: how many positions to leave out
    ANPos start = positions[from];
    if (in_.chance(40)) start = PickPos(in_, d);
    std::vector<ANPos> visit;
    for (size_t i = 0; i < positions.size(); ++i) {
        if (Cmp(positions[i], start) < 0) continue;
        if (skip != 0 && in_.below(4) < skip) continue;
        visit.push_back(positions[i]);
    }
    const uint32_t markLeft = in_.chance(32) ? 1 : 0;
    trail.back() += ": tracking walk from " + Text(start) + " over " + N(visit.size());
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    if (faulty_) {
        ANTrackInfo track{};
        CALL(ANStartAnnoTrack(d.handle, &start, &track));
        for (const ANPos &p : visit) CALL(ANTrackAnno(d.handle, &p, &track));
    } else {
        CheckTrackingWalk(d.handle, start, visit, markLeft);
    }
    CHECK(bytes == TableBytes(d.handle), "tracking changed the table");
}

void Run::TextReads(Document &d) {
    std::vector<ANPos> positions;
    const std::vector<std::pair<ANPos, uint32_t>> anchors = TextAnchors(ListEntries(d.handle));
    const uint32_t count = 1 + in_.below(24);
    for (uint32_t i = 0; i < count; ++i) {
        if (!anchors.empty() && in_.chance(200)) {
            const auto &pick = anchors[in_.below(anchors.size())];
            ANPos p = pick.first;
            p.kind = in_.chance(240) ? ANPOS_ANNOTEXT : 0;
            p.textIndex = in_.below(pick.second + 2);
            if (in_.chance(16)) p.subItemId = p.subItemId == ANPOS_NOSUBITEM ? 0 : ANPOS_NOSUBITEM;
            positions.push_back(p);
        } else {
            positions.push_back(PickPos(in_, d));
        }
    }
    trail.back() += ": " + N(count) + " text reads";
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    if (faulty_) {
        ANAnnoTextTrack track{};
        if (CALL(ANStartAnnoTextTrack(d.handle, &track)) == 0) {
            for (const ANPos &p : positions) {
                uint16_t unit = 0;
                CALL(ANGetAnnoText(d.handle, &track, &p, &unit));
            }
        }
        CALL(ANEndAnnoTextTrack(d.handle, &track));
        CHECK(track.segs == nullptr, "an ended text track keeps its list");
    } else {
        CheckTextReads(d.handle, positions);
    }
    CHECK(bytes == TableBytes(d.handle), "reading text changed the table");
}

void Run::Event(Document &d) {
    static constexpr uint32_t kEvents[] = {ANEVENT_CLICK1,
                                           ANEVENT_CLICK2,
                                           ANEVENT_CLICK3,
                                           ANEVENT_MOVE,
                                           ANEVENT_MOVE,
                                           ANEVENT_MOVE,
                                           3,
                                           ANEVENT_ENTER,
                                           ANEVENT_LEAVE,
                                           0x40};
    const uint32_t event = in_.chance(250) ? kEvents[in_.below(10)] : in_.u32();
    const ANPos pos = PickPos(in_, d);
    uint16_t entry = AN_NONE;
    const uint32_t how = in_.below(8);
    const std::vector<Entry> list = ListEntries(d.handle);
    if (how < 4) {
        // Where a viewer's tracking stands at the position.
        ANTrackInfo track{};
        if (CALL(ANStartAnnoTrack(d.handle, &pos, &track)) == ANTRACK_ACTIVE) entry = track.cursor;
    } else if (how < 6 && !list.empty()) {
        entry = list[in_.below(list.size())].slot;
    } else if (how == 6) {
        entry = static_cast<uint16_t>(in_.below(40));
    }
    trail.back() += ": event " + N(event) + " from slot " + N(entry) + " at " + Text(pos);
    ANPos hoverPos{};
    const uint16_t hoverEntry = annotest::HoverEntry(d.handle, &hoverPos);
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    const uint32_t rc = CALL(ANAnnoEvent(d.handle, event, entry, &pos));
    CHECK(bytes == TableBytes(d.handle), "an event changed the table");
    if (faulty_) return;
    if (!Bound(d)) {
        CHECK(rc == 0 && d.recorder.notes.empty(), "an event without state");
        return;
    }
    CheckEvent(list, event, entry, pos, hoverEntry, hoverPos, d.callback, d.recorder.notes, rc);
    const bool live = entry == AN_NONE || ListIndex(list)[entry] >= 0;
    const bool moved = !list.empty() && live && event == ANEVENT_MOVE &&
                       !(entry == AN_NONE && hoverEntry == AN_NONE);
    ANPos hoverAfter{};
    const uint16_t entryAfter = annotest::HoverEntry(d.handle, &hoverAfter);
    CHECK(moved ? entryAfter == entry && Same(hoverAfter, pos)
                : entryAfter == hoverEntry && Same(hoverAfter, hoverPos),
          "hover state after the event");
}

void Run::Find(Document &d) {
    ANFindRecord find;
    std::memset(&find, 0x3C, sizeof find);
    find.size = in_.chance(245) ? ANFINDRECORD_SIZE : in_.below(129);
    static constexpr uint16_t kTests[] = {ANFIND_MASK, ANFIND_EQUAL, ANFIND_MASK | ANFIND_EQUAL, 0};
    find.mode = static_cast<uint16_t>(in_.below(8) | kTests[in_.below(4)] |
                                      (in_.chance(16) ? in_.u16() & 0xCF00 : 0));
    find.tag = PickTag(in_);
    find.key = PickPos(in_, d);
    find.foundEnd = PickPos(in_, d);
    const uint16_t flags = static_cast<uint16_t>(in_.chance(240) ? in_.below(2) : in_.u16());
    trail.back() += ": find mode " + N(find.mode) + " flags " + N(flags) + " tag " + N(find.tag) +
                    " key " + Text(find.key);
    const ANFindRecord before = find;
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    const uint32_t rc = CALL(ANFindAnno(d.handle, flags, &find));
    CHECK(bytes == TableBytes(d.handle), "finding changed the table");
    if (faulty_) return;
    if (!Bound(d)) {
        CHECK(rc == AN_ERR_NOSTATE || (before.size != ANFINDRECORD_SIZE && rc == AN_ERR_BADARG),
              "finding without state gave " + N(rc));
        CHECK(std::memcmp(&before, &find, sizeof find) == 0, "record written");
        return;
    }
    ANFindRecord expected{};
    bool startKnown = true;
    const uint32_t want = ExpectedFind(d.handle, flags, before, &expected, &startKnown);
    CHECK(rc == want, "result " + N(rc) + ", expected " + N(want));
    if (rc != 0) {
        CHECK(std::memcmp(&before, &find, sizeof find) == 0, "record written without a find");
        return;
    }
    CHECK(find.foundTag == expected.foundTag && find.foundUserData == expected.foundUserData &&
              Same(find.foundEnd, expected.foundEnd),
          "found tag " + N(find.foundTag) + " end " + Text(find.foundEnd) + ", expected tag " +
              N(expected.foundTag) + " end " + Text(expected.foundEnd));
    if (startKnown) {
        CHECK(Same(find.foundStart, expected.foundStart),
              "found start " + Text(find.foundStart) + ", expected " + Text(expected.foundStart));
    }
    CHECK(find.size == before.size && find.mode == before.mode && find.tag == before.tag &&
              Same(find.key, before.key),
          "input fields written");
}

void Run::Map(Document &d) {
    ANMapRecord map;
    std::memset(&map, 0x11, sizeof map);
    map.size = in_.chance(245) ? ANMAPRECORD_SIZE : in_.below(129);
    static constexpr uint32_t kFlags[] = {ANMAP_ORDINAL_TO_POS, ANMAP_POS_TO_ORDINAL, 3, 0};
    map.flags = in_.chance(245) ? kFlags[in_.below(4)] : in_.u32();
    uint32_t characters = 0;
    for (const antk::ItemView &item : d.items) characters += item.charCount;
    map.ordinal = in_.below(characters + 3);
    map.pos = PickPos(in_, d);
    map.pos.kind = in_.u32();
    map.pos.textIndex = in_.u32();
    trail.back() +=
        ": map flags " + N(map.flags) + " ordinal " + N(map.ordinal) + " pos " + Text(map.pos);
    const ANMapRecord before = map;
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    const uint32_t rc = CALL(ANMapPosition(d.handle, &map));
    CHECK(bytes == TableBytes(d.handle), "mapping changed the table");
    CHECK(map.size == before.size && map.flags == before.flags && map.pos.kind == before.pos.kind &&
              map.pos.textIndex == before.pos.textIndex,
          "fields mapping must not write");
    if (rc != 0) {
        CHECK(std::memcmp(&before, &map, sizeof map) == 0, "a failed mapping wrote the record");
    }
    if (faulty_) return;
    if (!Bound(d)) {
        CHECK(rc == AN_ERR_NOSTATE || rc == AN_ERR_BADARG, "mapping without state gave " + N(rc));
        return;
    }
    if (map.size != ANMAPRECORD_SIZE || (map.flags & 3) == 0) {
        CHECK(rc == AN_ERR_BADARG, "a bad map record gave " + N(rc));
        return;
    }
    CHECK(rc == 0 || rc == AN_ERR_NOTFOUND || rc == AN_ERR_NOSTATE, "mapping gave " + N(rc));
    // A character of a text item maps to its ordinal and back to itself.
    if ((map.flags & ANMAP_ORDINAL_TO_POS) == 0 && rc == 0) {
        bool character = false;
        for (const antk::ItemView &item : d.items) {
            if (item.id == before.pos.itemId && item.type == antk::kItemText &&
                before.pos.subItemId - item.firstChar < item.charCount) {
                character = true;
            }
        }
        if (!character) return;
        ANMapRecord back = map;
        back.flags = ANMAP_ORDINAL_TO_POS;
        back.pos.itemId = back.pos.subItemId = 0x12345;
        const uint32_t rcBack = CALL(ANMapPosition(d.handle, &back));
        if (rcBack == 0 && back.pos.itemId != 0x12345) {
            CHECK(
                back.pos.itemId == before.pos.itemId && back.pos.subItemId == before.pos.subItemId,
                "ordinal " + N(map.ordinal) + " maps back to " + Text(back.pos));
        }
    }
}

// ---- Styles, copying, building
// -------------------------------------------------------------------

void Run::Styles(Document &d) {
    ANHiliteStyle style{};
    style.size = in_.chance(200)   ? ANHILITESTYLE_SIZE
                 : in_.chance(200) ? ANHILITESTYLE_SIZE_OLD
                                   : in_.below(129);
    style.styleId = 1 + in_.below(12);
    style.flags = in_.below(8);
    style.color1 = in_.u32();
    style.color2 = in_.u32();
    style.attr1 = static_cast<uint16_t>(in_.u16());
    style.attr2 = static_cast<uint16_t>(in_.u16());
    style.reserved = in_.u32();
    const bool good = style.size == ANHILITESTYLE_SIZE || style.size == ANHILITESTYLE_SIZE_OLD;
    ANHiliteStyle stored = style;
    if (style.size == ANHILITESTYLE_SIZE_OLD) {
        stored.size = ANHILITESTYLE_SIZE;
        stored.attr2 = 0xFFFF;
        stored.reserved = 0;
    }
    const uint32_t how = in_.below(6);
    trail.back() += ": styles " + N(how) + " id " + N(style.styleId) + " size " + N(style.size);
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    switch (how) {
        case 0: {  // the global table, when there is one
            const uint32_t rc = CALL(ANAddGlobalHiliteStyle(global_, &style));
            if (faulty_) break;
            if (global_ == nullptr || !good) {
                CHECK(rc == AN_ERR_BADARG, "adding a bad style gave " + N(rc));
                break;
            }
            CHECK(rc == 0, "adding a global style gave " + N(rc));
            ANHiliteStyle got{};
            CHECK(CALL(ANGetGlobalHiliteStyle(global_, style.styleId, &got)) == 0 &&
                      (std::memcmp(&got, &stored, 24) == 0) && got.reserved == stored.reserved,
                  "a global style reads back otherwise");
            break;
        }
        case 1: {
            ANHiliteStyle got;
            std::memset(&got, 0x42, sizeof got);
            const ANHiliteStyle untouched = got;
            const uint32_t rc = CALL(
                ANGetGlobalHiliteStyle(global_, style.styleId, in_.chance(200) ? &got : nullptr));
            if (faulty_) break;
            if (global_ == nullptr) CHECK(rc == AN_ERR_BADARG, "a null table gave " + N(rc));
            if (rc != 0)
                CHECK(std::memcmp(&got, &untouched, sizeof got) == 0, "a failed lookup wrote");
            break;
        }
        case 2: {
            const uint32_t rc = CALL(ANAddHiliteStyle(d.handle, &style));
            if (faulty_) break;
            if (!Bound(d)) {
                CHECK(rc == AN_ERR_NOSTATE, "adding a style without state gave " + N(rc));
                break;
            }
            if (!good) {
                CHECK(rc == AN_ERR_BADARG, "adding a bad style gave " + N(rc));
                break;
            }
            CHECK(rc == 0, "adding a style gave " + N(rc));
            ANHiliteStyle got{};
            CHECK(CALL(ANGetHiliteStyle(d.handle, style.styleId, &got)) == 1 &&
                      std::memcmp(&got, &stored, 24) == 0 && got.reserved == stored.reserved,
                  "a document's style reads back otherwise");
            break;
        }
        case 3: {
            ANHiliteStyle got{};
            const uint32_t rc =
                CALL(ANGetHiliteStyle(d.handle, style.styleId, in_.chance(200) ? &got : nullptr));
            if (!faulty_) CHECK(rc == 0 || rc == 1, "ANGetHiliteStyle gave " + N(rc));
            break;
        }
        case 4: {  // a table of one's own, made and freed
            ANStyleTable *table = nullptr;
            const uint32_t rc = CALL(ANInitGlobalHiliteStyles(in_.chance(240) ? &table : nullptr));
            if (table != nullptr) {
                const uint32_t adds = in_.below(24);
                for (uint32_t i = 0; i < adds; ++i) {
                    style.styleId = in_.below(30);
                    CALL(ANAddGlobalHiliteStyle(table, &style));
                }
                CHECK(CALL(ANDeInitGlobalHiliteStyles(table)) == 0, "freeing a style table");
            } else if (!faulty_) {
                CHECK(rc == AN_ERR_BADARG, "a null handle gave " + N(rc));
            }
            CHECK(CALL(ANDeInitGlobalHiliteStyles(nullptr)) == AN_ERR_BADARG, "freeing no table");
            break;
        }
        default:
            CHECK(CALL(ANGetGlobalHiliteStyle(nullptr, 1, nullptr)) == AN_ERR_BADARG,
                  "a null table");
            CHECK(CALL(ANAddGlobalHiliteStyle(nullptr, &style)) == AN_ERR_BADARG, "a null table");
            CHECK(CALL(ANInitGlobalHiliteStyles(nullptr)) == AN_ERR_BADARG, "a null handle");
            break;
    }
    CHECK(bytes == TableBytes(d.handle), "a style operation changed the annotation table");
}

void Run::Copy() {
    Document *dest = in_.chance(128) ? &a_ : &b_;
    Document *src = in_.chance(200) ? (dest == &a_ ? &b_ : &a_) : dest;
    trail.back() = "copy " + std::string(src == &a_ ? "A" : "B") + " to " +
                   (dest == &a_ ? "A" : "B") + (faulty_ ? " with a failure armed" : "");
    const std::vector<Entry> source = ListEntries(src->handle);
    const std::vector<Entry> target = ListEntries(dest->handle);
    // Copying back and forth doubles the tables each time; insertion into a full
    // document walks back from its end, so past a few thousand entries an input
    // would only measure that.
    if (source.size() + target.size() > 1500) return;
    const uint32_t rc = CALL(ANCopyAnnos(dest->handle, src->handle));
    CHECK(dest->recorder.notes.empty() && src->recorder.notes.empty(), "copying notified");
    if (src != dest)
        CHECK(SameListing(source, ListEntries(src->handle)), "copying changed the source");
    if (faulty_) return;
    if (!Bound(*src)) {
        CHECK(rc == AN_ERR_NOSTATE, "copying from a document without state gave " + N(rc));
        return;
    }
    if (source.empty()) {
        CHECK(rc == 0 && SameListing(target, ListEntries(dest->handle)), "copying nothing");
        return;
    }
    if (!Bound(*dest)) {
        CHECK(rc == AN_ERR_NOSTATE, "copying to a document without state gave " + N(rc));
        return;
    }
    CHECK(rc == 0, "copying gave " + N(rc));
    const std::vector<Entry> after = ListEntries(dest->handle);
    if (src == dest) {
        CHECK(SameListing(source, after), "copying a document onto itself changed it");
        return;
    }
    if (target.empty()) {
        // Into an empty document: the same annotation text at every anchor.
        for (const Entry &e : source) {
            if (e.type != AN_TYPE_TEXT && e.type != AN_TYPE_PLACEHOLDER) continue;
            CHECK(AnchorText(after, e.record.start) == AnchorText(source, e.record.start),
                  "copied annotation text at " + Text(e.record.start));
        }
        // Every point, highlight and cut marker once more (texts and ranges may join).
        CHECK(after.size() <= source.size(), "copying made more entries than the source has");
        std::vector<bool> used(after.size());
        for (const Entry &y : source) {
            if (y.type == AN_TYPE_RANGE || y.type == AN_TYPE_TEXT || y.type == AN_TYPE_PLACEHOLDER)
                continue;
            size_t i = 0;
            for (; i < after.size(); ++i) {
                const ANAnnoRecord &x = after[i].record;
                if (!used[i] && after[i].type == y.type && x.tag == y.record.tag &&
                    Same(x.start, y.record.start) && Same(x.end, y.record.end) &&
                    x.userData == y.record.userData && x.value == y.record.value &&
                    after[i].text == y.text && !after[i].ownsUserData)
                    break;
            }
            CHECK(i < after.size(), "no copy of the entry at " + Text(y.record.start));
            used[i] = true;
        }
    }
}

void Run::Build(Document &d) {
    trail.back() += ": build";
    const uint32_t rc = CALL(ANBuildAnnos(d.handle));
    for (const Note &n : d.recorder.notes) {
        CHECK(n.code == ANNOTIFY_ADDED && n.detail == AN_TYPE_HILITE &&
                  (n.record.tag & 0x80000000u) != 0,
              "a built annotation's notification");
    }
    if (faulty_) return;
    if (!Bound(d)) {
        CHECK(rc == AN_ERR_NOSTATE, "building without state gave " + N(rc));
        return;
    }
    CHECK(rc == 0, "building gave " + N(rc));
    CHECK(annotest::BuildCursor(d.handle) == d.ranges, "buildCursor after building");
}

// ---- Positions
// -----------------------------------------------------------------------------------

void Run::Step(Document &d) {
    trail.back() += ": stepping";
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    if (!faulty_ && Bound(d)) {
        // The merged walk meets every content position in order, text only where
        // there is some, and ends.
        const std::vector<ANPos> walk = WalkPositions(d, true);
        const std::vector<Entry> list = ListEntries(d.handle);
        auto isContent = [&](const ANPos &p) {
            for (const ANPos &c : d.content) {
                if (SameAnchor(c, p)) return true;
            }
            return false;
        };
        auto isTextAnchor = [&](const ANPos &p) {
            for (const Entry &e : list) {
                if ((e.type == AN_TYPE_TEXT || e.type == AN_TYPE_PLACEHOLDER) &&
                    SameAnchor(e.record.start, p)) {
                    return true;
                }
            }
            return false;
        };
        std::vector<ANPos> visited;  // content positions, and anchors of annotation text
        for (const ANPos &p : walk) {
            if (p.kind == ANPOS_ANNOTEXT) {
                CHECK(isTextAnchor(p),
                      "the walk entered annotation text at " + Text(p) + " where there is none");
                continue;
            }
            CHECK(isContent(p) || isTextAnchor(p),
                  "the walk met " + Text(p) + ", neither content nor a text anchor");
            visited.push_back(p);
        }
        // Every content position is met up to the first anchor of annotation text that
        // is not content (a text item itself, or a place the chunker does not have),
        // from where stepping goes on as the chunker answers.
        ANPos stray{0xFFFFFFFFu, 0xFFFFFFFFu, 0, 0};
        for (const ANPos &v : walk) {
            if (!isContent(v)) {
                stray = v;
                break;
            }
        }
        for (const ANPos &c : d.content) {
            if (Cmp(c, walk.front()) <= 0) continue;
            bool met = false;
            for (const ANPos &v : visited) met |= SameAnchor(v, c);
            const bool excused = Cmp(stray, c) < 0;
            if (!met && !excused) {
                std::string seen;
                for (const ANPos &w : walk) {
                    seen += ' ';
                    seen += Text(w);
                }
                Fail("the walk missed " + Text(c) + "; walked" + seen);
            }
        }
    }
    // Single steps from anywhere.
    const uint32_t count = 1 + in_.below(6);
    for (uint32_t k = 0; k < count; ++k) {
        const ANPos p = PickPos(in_, d);
        ANPos next;
        std::memset(&next, 0x66, sizeof next);
        const ANPos untouched = next;
        switch (in_.below(4)) {
            case 0: {
                const uint32_t rc = CALL(ANNextPos(d.handle, &p, &next));
                if (faulty_) break;
                CHECK(rc == 0 || rc == AN_ERR_NOTFOUND, "ANNextPos gave " + N(rc));
                if (rc == 0)
                    CHECK(Cmp(next, p) > 0, "ANNextPos from " + Text(p) + " to " + Text(next));
                if (rc != 0) CHECK(Same(next, untouched), "a failed ANNextPos wrote");
                break;
            }
            case 1: {
                const bool text = p.kind == ANPOS_ANNOTEXT;
                const uint32_t rc =
                    CALL(ANNextChunkerPos(text && in_.chance(128) ? nullptr : d.handle, &p, &next));
                if (faulty_) break;
                if (text) {
                    CHECK(rc == 0 && Same(next, (ANPos{p.itemId, p.subItemId, 0, 0})),
                          "from annotation text to its anchor");
                } else if (!Bound(d)) {
                    CHECK(rc == AN_ERR_NOSTATE, "ANNextChunkerPos without state gave " + N(rc));
                } else if (rc == 0) {
                    CHECK(Cmp(next, p) > 0 && next.kind == 0 && next.textIndex == 0,
                          "ANNextChunkerPos from " + Text(p) + " to " + Text(next));
                } else {
                    CHECK(rc == AN_ERR_NOTFOUND, "ANNextChunkerPos gave " + N(rc));
                }
                break;
            }
            case 2: {
                const uint32_t rc = CALL(ANNextAnnoTextPos(d.handle, &p, &next));
                if (faulty_) break;
                if (!Bound(d)) {
                    CHECK(rc == AN_ERR_NOSTATE, "ANNextAnnoTextPos without state gave " + N(rc));
                } else if (rc == 0) {
                    CHECK(next.kind == ANPOS_ANNOTEXT, "ANNextAnnoTextPos gave " + Text(next));
                } else {
                    CHECK(rc == AN_ERR_NOTFOUND, "ANNextAnnoTextPos gave " + N(rc));
                }
                break;
            }
            default: {
                const uint32_t rc = CALL(ANNextChunkerPos(nullptr, &p, &next));
                if (p.kind != ANPOS_ANNOTEXT)
                    CHECK(rc == AN_ERR_BADARG, "a null document gave " + N(rc));
                break;
            }
        }
    }
    CHECK(bytes == TableBytes(d.handle), "stepping changed the table");
}

// The order as a key: (itemId; subItemId with 0xFFFFFFFF as 0; text before content;
// textIndex for text, the item before its characters for content).
int KeyCompare(const ANPos &a, const ANPos &b) {
    auto key = [](const ANPos &p) {
        const uint64_t sub = p.subItemId == ANPOS_NOSUBITEM ? 0 : p.subItemId;
        const uint64_t content = p.kind == ANPOS_ANNOTEXT ? 0 : 1;
        const uint64_t last =
            p.kind == ANPOS_ANNOTEXT ? p.textIndex : (p.subItemId == ANPOS_NOSUBITEM ? 0 : 1);
        return std::tuple<uint64_t, uint64_t, uint64_t, uint64_t>(p.itemId, sub, content, last);
    };
    const auto ka = key(a);
    const auto kb = key(b);
    return ka < kb ? -1 : (kb < ka ? 1 : 0);
}

void Run::Compare(Document &d) {
    trail.back() += ": comparing";
    const uint32_t count = 1 + in_.below(8);
    for (uint32_t k = 0; k < count; ++k) {
        const ANPos a = PickPos(in_, d);
        const ANPos b = in_.chance(64) ? a : PickPos(in_, d);
        const int ab = CALL(ANCompPos(&a, &b));
        const int ba = CALL(ANCompPos(&b, &a));
        CHECK(ab == -ba && ab >= -1 && ab <= 1, Text(a) + " against " + Text(b));
        CHECK(ab == KeyCompare(a, b),
              Text(a) + " against " + Text(b) + " gave " + std::to_string(ab));
        CHECK(CALL(ANIsAnnoTextPos(&a)) == (a.kind == ANPOS_ANNOTEXT ? 1u : 0u), "ANIsAnnoTextPos");
    }
}

// ---- The document's life
// --------------------------------------------------------------------------

void Run::Callback(Document &d) {
    const bool on = in_.chance(180);
    trail.back() += on ? ": callback on" : ": callback off";
    const uint32_t rc = CALL(ANSetCallback(d.handle, on ? Notify : nullptr, &d.recorder));
    if (rc == 0) d.callback = on;
    if (faulty_) return;
    CHECK(rc == (Bound(d) ? 0u : AN_ERR_NOSTATE), "ANSetCallback gave " + N(rc));
    CHECK(CALL(ANSetCallback(nullptr, nullptr, nullptr)) == AN_ERR_BADARG, "a null document");
}

void Run::Lifecycle(Document &d) {
    const uint32_t how = in_.below(4);
    trail.back() += ": lifecycle " + N(how);
    if (how == 0 && !Bound(d)) {
        Bind(d, in_.chance(200));
        return;
    }
    const uint32_t rc = CALL(ANDeInit(d.handle));
    if (!faulty_) CHECK(rc == 0 && !Bound(d), "ANDeInit gave " + N(rc));
    if (how != 3 && !Bound(d)) Bind(d, in_.chance(200));
    CHECK(CALL(ANDeInit(nullptr)) == AN_ERR_BADARG, "ANDeInit of a null document");
    CHECK(CALL(ANInit(nullptr, global_, nullptr, nullptr)) == 0, "ANInit of a null document");
}

void Run::Stale(Document &d) {
    // Records kept across changes of the annotations answer stale things, but safely.
    const ANPos p = PickPos(in_, d);
    trail.back() += ": stale records at " + Text(p);
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    switch (in_.below(4)) {
        case 0:
            CALL(ANStartAnnoTrack(d.handle, &p, &d.stale));
            break;
        case 1:
        case 2:
            CALL(ANTrackAnno(d.handle, &p, &d.stale));
            break;
        default:
            if (d.staleTextStarted) {
                uint16_t unit = 0;
                const uint32_t rc = CALL(ANGetAnnoText(d.handle, &d.staleText, &p, &unit));
                if (!faulty_) {
                    CHECK(rc == 5 || rc == 6 || rc == AN_ERR_NOTFOUND || rc == AN_ERR_NOSTATE,
                          "a stale text read gave " + N(rc));
                }
            }
            break;
    }
    CHECK(CALL(ANEndAnnoTrack(nullptr, nullptr)) == 0, "ANEndAnnoTrack");
    CHECK(bytes == TableBytes(d.handle), "a stale record changed the table");
}

void Run::ArmFailure() {
    armNext_ = true;
    const uint32_t n = 1 + in_.below(48);
    const bool sticky = in_.chance(64);
    if (in_.chance(128)) {
        trail.back() += ": arm allocation failure " + N(n) + (sticky ? " and on" : "");
        pendingAllocation = n;
        pendingSticky = sticky;
    } else {
        const uint32_t code = in_.chance(128) ? 99 : 1 + in_.below(30);
        trail.back() +=
            ": arm module failure " + N(n) + " code " + N(code) + (sticky ? " and on" : "");
        pendingCall = n;
        pendingCode = code;
        pendingCallSticky = sticky;
    }
}

void Run::Fill(Document &d) {
    // Every type but ranges (whose splitting would make the count unpredictable), spread
    // over the document by a fixed sequence, so the table has `fillers` entries.
    uint32_t seed = 12345;
    for (uint32_t i = 0; i < settings.fillers && Bound(d); ++i) {
        seed = seed * 1103515245u + 12345u;
        ANPos at = d.content[(seed >> 8) % d.content.size()];
        const ANPos to = d.content[(seed >> 16) % d.content.size()];
        ANAnnoRecord r{};
        r.size = AN_RECORD_SIZE_POINT;
        r.tag = 0x100 + i % 8;
        r.start = Cmp(at, to) <= 0 ? at : to;
        r.end = Cmp(at, to) <= 0 ? to : at;
        r.value = i;
        r.style = 0x40000000u | (1 + i % 10);
        uint16_t type = static_cast<uint16_t>(1 + i % 7);
        const uint16_t unit = static_cast<uint16_t>('a' + i % 26);
        if (type == AN_TYPE_RANGE) type = AN_TYPE_HILITE;
        if (type == AN_TYPE_TEXT) {
            r.size = 48;
            ANTextDesc t{48, r.tag, at, 0, &unit, 1, 0};
            CALL(ANAddAnno(d.handle, type, &t));
            continue;
        }
        if (type == AN_TYPE_PLACEHOLDER || type == AN_TYPE_CUTMARK) {
            ANPointDesc p{32, r.tag, r.start, 0};
            CHECK(CALL(ANAddAnno(d.handle, type, &p)) == 0, "adding a filler mark");
            continue;
        }
        CHECK(CALL(ANAddAnno(d.handle, type, &r)) == 0, "adding a filler");
    }
}

void Run::Finish() {
    if (settings.disarm) settings.disarm();
    SetContext("finishing the input");
    trail.push_back("finish");
    antk::clearFailures();
#if ANNO_FUZZ_PLATFORM_CONTROLS
    anwin::clearFailures();
#endif
    for (Document *d : {&a_, &b_}) {
        CALL(ANEndAnnoTextTrack(d->handle, &d->staleText));
        CHECK(d->staleText.segs == nullptr, "an ended text track keeps its list");
        if (Bound(*d)) {
            faulty_ = false;
            ClearUserData(*d);
            CHECK(CALL(ANDeInit(d->handle)) == 0, "ANDeInit");
        }
        for (uint64_t block : d->blocks)
            annotest::FreeHeapBlock(block);
        d->blocks.clear();
    }
    CHECK(antk::openSecondaryDocuments() == 0 && antk::openContents() == 0, "content left open");
    antk::destroyDocument(a_.handle);
    antk::destroyDocument(b_.handle);
    if (global_ != nullptr)
        CHECK(CALL(ANDeInitGlobalHiliteStyles(global_)) == 0, "freeing the global styles");
#if ANNO_FUZZ_PLATFORM_CONTROLS
    CHECK(anwin::heapBlocks() == heapAtStart_,
          N(anwin::heapBlocks() - heapAtStart_) + " heap blocks leaked");
    CHECK(anwin::globalBlocks() == globalAtStart_, "global blocks leaked");
    CHECK(anwin::globalLocks() == 0, "global blocks left locked");
#endif
}

}  // namespace

}  // namespace annofuzz

void annofuzz::RunInput(const uint8_t *data, size_t size) {
    Input in(data, size);
    Run run(in);
    run.Go();
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    annofuzz::RunInput(data, size);
    // A line per million calls, so that a long run shows its progress in its log.
    static uint64_t reported = 0;
    if (annofuzz::apiCalls / 1000000 > reported) {
        reported = annofuzz::apiCalls / 1000000;
        std::fprintf(stderr, "anno_fuzz: %llu API calls so far\n",
                     static_cast<unsigned long long>(annofuzz::apiCalls));
    }
    return 0;
}
