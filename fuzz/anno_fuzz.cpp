// The fuzz target: decodes its input into two toolkit documents, a global style table and
// calls over all 28 exports, as a viewer would make them and as a careless one might. After
// every operation the table rules hold, read-only operations leave the tables alone, and the
// answers are held against brute-force readings of the table. At the end of an input every
// heap and global block is back and no secondary document or content is open.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "anno/anno.h"
#include "anno/toolkit.h"
#include "fuzz_support.h"

#if !defined(_WIN32)
#include "anno/winapi_test.h"
#define ANNO_FUZZ_PLATFORM_CONTROLS 1
#else
#define ANNO_FUZZ_PLATFORM_CONTROLS 0
#endif

namespace annofuzz {

uint64_t apiCalls = 0;
Settings settings;
static std::string context;
static std::vector<std::string> trail;  // the operations of the current input

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
        if (list[i].slot >= at.size()) at.resize(list[i].slot + 1u, -1);
        at[list[i].slot] = static_cast<int>(i);
    }
}

bool SameListing(const std::vector<Entry> &a, const std::vector<Entry> &b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](Entry x, Entry y) {
        x.record.textBuffer = y.record.textBuffer, x.record.textCapacity = y.record.textCapacity;
        return x.slot == y.slot && x.type == y.type && x.text == y.text &&
               std::memcmp(&x.record, &y.record, sizeof(ANAnnoRecord)) == 0;
    });
}

namespace {

bool IsText(const Entry &e) { return e.type == AN_TYPE_TEXT || e.type == AN_TYPE_PLACEHOLDER; }

// ---- The documents -----------------------------------------------------------------

uint32_t RangeCode(Input &in) {
    static constexpr uint32_t kCodes[] = {0x8003000C, 0x80020008, 0x84000010, 0x81000000,
                                          0x82000000};
    const uint32_t pick = in.below(7);
    return pick < 5 ? kCodes[pick] : in.u32();
}

// What the callback of one document heard, and what it answered.
struct Recorder {
    std::vector<Note> notes;
    uint32_t seed = 1;
};

uint32_t Notify(uint16_t code, uint16_t detail, void *record, void *data) {
    auto *recorder = static_cast<Recorder *>(data);
    Note note{code, detail, {}, {}, 0};
    const bool event = code == ANNOTIFY_EVENT;
    if (record != nullptr)
        std::memcpy(event ? static_cast<void *>(&note.event) : &note.record, record,
                    event ? sizeof note.event : sizeof note.record);
    note.returned = (recorder->seed = recorder->seed * 1103515245u + 12345u) >> 16;
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
    std::set<uint64_t> blocks;   // userData blocks handed to this document, still live
    bool noStylesMaybe = false;  // bound under a failure: its style table may not exist
};

bool Bound(const Document &d) { return antk::annoSlot(d.handle) != nullptr; }

void ClearFailures() {
    antk::clearFailures();
#if ANNO_FUZZ_PLATFORM_CONTROLS
    anwin::clearFailures();
#endif
}

DAHandle BuildDocument(Input &in, uint32_t maxItems, uint32_t *ranges) {
    antk::DocumentBuilder builder(2 + in.below(8));
    const uint32_t count = 1 + in.below(maxItems);
    std::vector<uint32_t> ids, texts;
    for (uint32_t i = 0; i < count; ++i) {
        const uint32_t k = in.below(13);
        if (k < 4) {
            std::string chars(1 + in.below(4), 'a');
            for (char &c : chars) c = static_cast<char>('a' + in.below(26));
            texts.push_back(builder.textItem(std::string_view(chars)));
            ids.push_back(texts.back());
            continue;
        }
        if (k == 8) builder.newChunk();
        if (k == 9) builder.newSection();
        ids.push_back(k == 4    ? builder.cutItem()
                      : k < 7   ? builder.skippedItem(k == 5 ? antk::kItemSkip : antk::kItemSkip2)
                      : k == 7  ? builder.item(antk::kItemRangeEnd, RangeCode(in))
                      : k == 10 ? builder.item(0, in.below(3))
                                : builder.item(antk::kItemParagraph));
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
        for (uint32_t c = 0; c < item.charCount && item.type == antk::kItemText; ++c)
            d.content.push_back(ANPos{item.id, item.firstChar + c, 0, 0});
        if (item.type != antk::kItemText || item.charCount == 0)
            d.content.push_back(ANPos{item.id, ANPOS_NOSUBITEM, 0, 0});
    }
}

uint32_t PickTag(Input &in) {
    static constexpr uint32_t kTags[] = {0, 1, 2, 3, 6, 7, 14, 0x80000001, 0x80000007, 0x80200000};
    const uint32_t pick = in.below(12);
    return pick < 10 ? kTags[pick] : in.u32();
}

// Plain anchors that carry annotation text, with the number of their units.
std::vector<std::pair<ANPos, uint32_t>> TextAnchors(const std::vector<Entry> &list) {
    std::vector<std::pair<ANPos, uint32_t>> out;
    for (const Entry &e : list) {
        if (!IsText(e)) continue;
        const uint32_t units = e.type == AN_TYPE_TEXT ? e.record.textLength : 1;
        size_t k = 0;
        while (k < out.size() && !SameAnchor(out[k].first, e.record.start)) ++k;
        if (k == out.size()) out.push_back({e.record.start, 0});
        out[k].second += units;
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
        if (!anchors.empty() && how < 13) std::tie(p, units) = anchors[in.below(anchors.size())];
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
        if (list.empty()) return d.content.front();
        const Entry &e = list[in.below(list.size())];
        return in.chance(128) ? e.record.start : e.record.end;
    }
    return ANPos{in.below(4) == 0 ? in.u32() : in.below(0x30000),
                 in.chance(128) ? ANPOS_NOSUBITEM : in.u32(),
                 in.chance(200) ? in.below(8) : in.u32(), in.below(8)};
}

// The positions a viewer's walk meets, from the document's first content position.
// Unchecked, it stops where stepping fails to move forward; checked, that is a finding.
std::vector<ANPos> WalkPositions(const Document &d, bool check) {
    std::vector<ANPos> out{d.content.front()};
    size_t units = 0;
    for (const Entry &e : ListEntries(d.handle))
        units += e.type == AN_TYPE_TEXT ? e.record.textLength : 1;
    const size_t bound = d.content.size() + units + 16;
    for (ANPos p = out.front(), next{};; p = next) {
        next = {};
        const uint32_t rc = CALL(ANNextPos(d.handle, &p, &next));
        CHECK(!check || rc == 0 || rc == AN_ERR_NOTFOUND, "ANNextPos gave " + N(rc));
        const bool onward = Cmp(next, p) > 0 && out.size() <= bound;  // else: goes back, or on
        CHECK(!check || rc != 0 || onward, "ANNextPos went from " + Text(p) + " to " + Text(next));
        if (rc != 0 || !onward) break;
        out.push_back(next);
    }
    return out;
}

// Whether `list` holds a position at the plain anchor of `p`.
bool AtAnchor(const std::vector<ANPos> &list, const ANPos &p) {
    return std::any_of(list.begin(), list.end(), [&](const ANPos &q) { return SameAnchor(q, p); });
}

template <typename T>
void Put(uint8_t *desc, size_t at, T v) {
    std::memcpy(desc + at, &v, sizeof v);
}

uint32_t StyleWord(Input &in) {
    const uint32_t bits = in.u32();
    if (in.chance(100)) return ANSTYLEWORD_NUMBER | (bits & 0xBFFF0000u) | (1 + in.below(12));
    return bits & ~ANSTYLEWORD_NUMBER;
}

// A style of `size` with an id from 1 to `ids`, colours within `colours`, and with
// `reserved` something in its reserved field.
ANHiliteStyle NewStyle(Input &in, uint32_t size, uint32_t ids, uint32_t colours, bool reserved) {
    const auto u16 = [&] { return static_cast<uint16_t>(in.u16()); };
    return {
        size,  1 + in.below(ids),      in.below(8), in.u32() & colours, in.u32() & colours, u16(),
        u16(), reserved ? in.u32() : 0};
}

// ---- The run of one input -----------------------------------------------------------

class Run {
 public:
    explicit Run(Input &in) : in_(in) {}
    void Go();

 private:
    struct Op {  // an operation with its share of the op codes: those below `below`
        uint32_t below;
        void (Run::*run)(Document &);
        bool readOnly;  // must leave the document's table as it was
    };
    Document &Pick() { return in_.chance(200) ? a_ : b_; }
    const char *Name(const Document &d) const { return &d == &a_ ? "A" : "B"; }
    void CheckRules(const std::string &when);
    void Bind(Document &d, bool callback);
    uint64_t NewBlock(Document &d);
    bool Unheld(const Document &d, bool stateless, uint32_t rc);
    void CheckAdded(Document &d, uint16_t type, const ANPos &at, const std::vector<Entry> &before,
                    const std::vector<uint16_t> &text, const ANAnnoRecord *heard);
    void Fill(Document &d);
    void Finish();
    // The operations, each on the document picked for it (Copy picks its own two).
    void Add(Document &d), Clear(Document &d), ClearUserData(Document &d), Track(Document &d),
        TextReads(Document &d), Event(Document &d), Find(Document &d), Map(Document &d),
        Styles(Document &d), Copy(Document &), Build(Document &d), Step(Document &d),
        Callback(Document &d), Lifecycle(Document &d), ArmFailure(Document &);

    Input &in_;
    Document a_, b_;
    ANStyleTable *global_ = nullptr;
    bool faulty_ = false;  // a failure is armed for this operation
    bool armNext_ = false;
    // The failure ArmFailure chose, armed when the next operation begins.
    uint32_t pendingAllocation_ = 0, pendingCall_ = 0, pendingCode_ = 0;
    bool pendingSticky_ = false;
    int64_t heapAtStart_ = 0, globalAtStart_ = 0;
};

void Run::CheckRules(const std::string &when) {
    for (Document *d : {&a_, &b_}) {
        const std::string broken = annotest::DocumentRulesBroken(d->handle);
        if (!broken.empty()) Fail("table rules after " + when + ": " + broken);
        // Every entry that owns a userData block holds one this document was given.
        for (const Entry &e : ListEntries(d->handle)) {
            if (!e.ownsUserData || e.record.userData == 0) continue;
            CHECK(e.type == AN_TYPE_HILITE || e.type == AN_TYPE_RANGE || e.type == AN_TYPE_TEXT,
                  "a type-" + N(e.type) + " entry owns a userData block");
            CHECK(d->blocks.count(e.record.userData) != 0,
                  "slot " + N(e.slot) + " owns userData " + N(e.record.userData) + ", not given");
        }
    }
}

uint64_t Run::NewBlock(Document &d) {
    // Reuse a block already given to this document now and then: one block may be
    // shared by several annotations.
    if (!d.blocks.empty() && in_.chance(48))
        return *std::next(d.blocks.begin(), in_.below(d.blocks.size()));
    const uint64_t value = annotest::NewHeapBlock(8 + in_.below(24));
    if (value != 0) d.blocks.insert(value);
    return value;
}

void Run::Bind(Document &d, bool callback) {
    d.callback = callback;
    const uint32_t rc = CALL(ANInit(d.handle, in_.chance(200) ? global_ : nullptr,
                                    callback ? Notify : nullptr, &d.recorder));
    d.noStylesMaybe = faulty_;
    if (!faulty_) CHECK(rc == 0 && Bound(d), "ANInit gave " + N(rc));
}

// Whether an operation's answers go unchecked from here: with a failure armed, or when
// `d` has no annotation state, where `stateless` (what the call, giving `rc`, must then
// have done) is checked.
bool Run::Unheld(const Document &d, bool stateless, uint32_t rc) {
    if (faulty_ || Bound(d)) return faulty_;
    CHECK(stateless, "result " + N(rc) + " without annotation state");
    return true;
}

void Run::Go() {
    // ANNO_FUZZ_TRACE=1 prints each operation as it ends: what a hang was doing.
    static const bool trace = std::getenv("ANNO_FUZZ_TRACE") != nullptr;
    static constexpr Op kOps[] = {
        {15, &Run::Add, false},       {18, &Run::Clear, false},    {19, &Run::ClearUserData, false},
        {22, &Run::Track, true},      {24, &Run::TextReads, true}, {26, &Run::Event, true},
        {28, &Run::Find, true},       {29, &Run::Map, true},       {31, &Run::Styles, true},
        {32, &Run::Copy, false},      {33, &Run::Build, false},    {34, &Run::Step, true},
        {35, &Run::Step, true},       {36, &Run::Callback, false}, {37, &Run::Lifecycle, false},
        {40, &Run::ArmFailure, false}};
    trail.clear();
    SetContext("setting up");
    ClearFailures();
    heapAtStart_ = annotest::HeapBlocks();
    globalAtStart_ = annotest::GlobalBlocks();
    a_.handle = BuildDocument(in_, 24, &a_.ranges);
    b_.handle = BuildDocument(in_, 8, &b_.ranges);
    Describe(a_);
    Describe(b_);
    if (in_.chance(220)) {
        CHECK(CALL(ANInitGlobalHiliteStyles(&global_)) == 0, "making a global style table");
        for (uint32_t i = in_.below(12), size = 0; i > 0; --i) {
            size = in_.chance(200) ? ANHILITESTYLE_SIZE : ANHILITESTYLE_SIZE_OLD;
            const ANHiliteStyle s = NewStyle(in_, size, 10, 0xFFFFFF, false);
            CHECK(CALL(ANAddGlobalHiliteStyle(global_, &s)) == 0, "adding a global style");
        }
    }
    Bind(a_, in_.chance(220));
    Bind(b_, in_.chance(160));
    Fill(a_);
    if (settings.arm) settings.arm();

    for (uint32_t ops = 0; !in_.done() && ops < 64; ++ops) {
        faulty_ = armNext_ || settings.sweep;
        armNext_ = false;
        // Set only by ArmFailure, so only when faulty_.
#if ANNO_FUZZ_PLATFORM_CONTROLS
        if (pendingAllocation_ != 0) anwin::failAllocation(pendingAllocation_, pendingSticky_);
#endif
        if (pendingCall_ != 0) antk::failAnyCall(pendingCall_, pendingCode_, pendingSticky_);
        pendingAllocation_ = pendingCall_ = 0;
        const uint32_t code = in_.below(40);
        Document &d = Pick();
        trail.push_back("op " + N(code) + " on " + Name(d) +
                        (faulty_ ? " with a failure armed" : ""));
        SetContext(trail.back());
        for (Document *x : {&a_, &b_}) x->recorder.notes.clear();
        const Op &op = *std::find_if(std::begin(kOps), std::end(kOps),
                                     [&](const Op &o) { return code < o.below; });
        const std::vector<uint8_t> bytes =
            op.readOnly ? TableBytes(d.handle) : std::vector<uint8_t>{};
        (this->*op.run)(d);
        CHECK(!op.readOnly || bytes == TableBytes(d.handle), "a read-only op changed the table");
        if (!settings.sweep) ClearFailures();  // a sweep's failure may hit any later operation
        CheckRules(trail.back());
        if (trace) std::fprintf(stderr, "anno_fuzz: done %s\n", trail.back().c_str());
    }
    Finish();
}

// ---- Adding ----------------------------------------------------------------------------

void Run::Add(Document &d) {
    // The descriptor sizes of each type: the current layout first, then older, shorter ones.
    static constexpr uint32_t kSizes[8][3] = {{},       {72, 60, 48}, {72, 64, 32}, {48, 44, 40},
                                              {72, 64}, {48},         {32, 28},     {32, 28}};
    const uint16_t type = static_cast<uint16_t>(1 + in_.below(7));
    alignas(8) uint8_t desc[136] = {};
    const uint32_t tag = PickTag(in_);
    const ANPos start = PickPos(in_, d);
    const ANPos end = PickPos(in_, d);
    uint64_t userData = in_.chance(128) ? in_.u32() : 0;
    std::vector<uint16_t> text(in_.chance(12) ? 56 + in_.below(16) : in_.below(6));  // buffers grow
    for (uint16_t &u : text) u = static_cast<uint16_t>('A' + in_.below(26));
    // A null text pointer is refused unless the text is empty.
    const uint16_t *textPointer = in_.chance(text.empty() ? 128 : 4) ? nullptr : text.data();
    const uint32_t size =
        kSizes[type][type == AN_TYPE_TEXT          ? 0
                     : type >= AN_TYPE_PLACEHOLDER ? (in_.chance(128) ? 0 : 1)
                                                   : in_.below(type == AN_TYPE_VALUE ? 2 : 3)];
    // The layouts: the position at 8 (a short point: its item); types 1 to 4 an end at 24;
    // types 1, 2 and 4 an event mask at 40; userData at `udAt` in `udBytes` bytes (0: none).
    const bool shortPoint = type == AN_TYPE_POINT && size == 32;
    const bool extent = type <= AN_TYPE_VALUE && !shortPoint;
    uint32_t udAt = 24, udBytes = size == 28 ? 4 : 8;
    if (shortPoint) {  // item, event mask, value
        Put(desc, 8, start.itemId);
        Put(desc, 16, in_.u32() & 0x3F);
        Put<uint64_t>(desc, 24, in_.u32());
        udBytes = 0;
    } else {
        Put(desc, 8, start);
    }
    if (extent) Put(desc, 24, end);
    if (type == AN_TYPE_RANGE) udAt = 40, udBytes = size == 48 ? 8 : size == 44 ? 4 : 0;
    if (extent && type != AN_TYPE_RANGE) {
        Put(desc, 40, in_.u32() & 0x3F);
        udAt = size == 72 ? 48 : 44, udBytes = size == 72 ? 8 : 4;
        if (type == AN_TYPE_HILITE) {  // the style word at 64, 56 or 44; no userData at 48
            const uint32_t style = StyleWord(in_);
            if (size == 72) Put<uint64_t>(desc, 56, in_.u32());
            Put(desc, size == 72 ? 64 : size == 60 ? 56 : 44, style);
            if (size == 48) udBytes = 0;
        } else {
            Put<uint64_t>(desc, 56, in_.u32());
            if (size == 72) Put<uint64_t>(desc, 64, in_.u32());
        }
    }
    if (type == AN_TYPE_TEXT) Put(desc, 32, textPointer), Put(desc, 40, uint32_t(text.size()));
    Put(desc, 0, size);
    Put(desc, 4, tag);
    // Types 1, 3 and 5 hand a block over, or nothing; the others carry any value.
    const bool blockType = type == AN_TYPE_HILITE || type == AN_TYPE_RANGE || type == AN_TYPE_TEXT;
    if (blockType) userData = udBytes == 8 && in_.chance(100) ? NewBlock(d) : 0;
    if (udBytes == 8) Put(desc, udAt, userData);
    if (udBytes == 4) Put(desc, udAt, static_cast<uint32_t>(userData));
    trail.back() += ": add type " + N(type) + " size " + N(size) + " tag " + N(tag) + " " +
                    Text(start) + (extent ? " to " + Text(end) : "") +
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
        const ANAnnoRecord &r = notes[0].record;  // points have no extent; sizes normalised
        const uint32_t size = type == AN_TYPE_TEXT ? AN_RECORD_SIZE_TEXT
                              : type == AN_TYPE_RANGE || type >= AN_TYPE_PLACEHOLDER
                                  ? AN_RECORD_SIZE_SHORT
                                  : AN_RECORD_SIZE_POINT;
        CHECK(r.tag == tag && Cmp(r.start, r.end) <= 0 && r.size == size &&
                  (type == AN_TYPE_HILITE || type == AN_TYPE_RANGE || Same(r.start, r.end)),
              "notified tag " + N(r.tag) + " size " + N(r.size) + " " + Text(r.start));
    } else {
        CHECK(notes.empty(), "notified without a callback");
    }
    if (rc == 0 && Bound(d))  // also when a failure was armed: an add that succeeds is whole
        CheckAdded(d, type, start, before, text, d.callback ? &notes[0].record : nullptr);
    CHECK(rc == 0 || type == AN_TYPE_RANGE || SameListing(before, ListEntries(d.handle)),
          "an add that failed with " + N(rc) + " changed the table");  // a range keeps pieces
    if (Unheld(d, rc == AN_ERR_NOSTATE || rc == AN_ERR_BADARG, rc)) return;
    const bool nullText = type == AN_TYPE_TEXT && textPointer == nullptr && !text.empty();
    CHECK(rc == AN_ERR_BADARG || (rc == 0 && !nullText), "adding gave " + N(rc));
    CHECK(rc == 0 || SameListing(before, ListEntries(d.handle)), "a refused add changed the table");
}

// What an add must have done: a point, a highlight or a cut marker is the one new entry,
// with the record the callback heard, and the others keep their order; text and
// placeholders go into the annotation text of their anchor where the position says, and
// the text of every other anchor stays as it was.
void Run::CheckAdded(Document &d, uint16_t type, const ANPos &at, const std::vector<Entry> &before,
                     const std::vector<uint16_t> &text, const ANAnnoRecord *heard) {
    const std::vector<Entry> after = ListEntries(d.handle);
    // Not at a kind of the caller's own.
    bool plain = at.kind == 0 || at.kind == ANPOS_ANNOTEXT;
    for (const Entry &e : before) plain &= e.record.start.kind == 0 || e.record.start.kind == 5;
    if ((type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER) && plain) {
        std::u16string expected = AnchorText(before, at);
        const size_t k = at.kind == ANPOS_ANNOTEXT ? at.textIndex : expected.size();
        CHECK(k <= expected.size(), "text went in at " + N(k) + " of " + N(expected.size()));
        expected.insert(
            k, type == AN_TYPE_PLACEHOLDER ? u"\xFFFF" : std::u16string(text.begin(), text.end()));
        CHECK(AnchorText(after, at) == expected, "text at " + Text(at));
        for (const Entry &e : before)
            CHECK(SameAnchor(e.record.start, at) ||
                      AnchorText(after, e.record.start) == AnchorText(before, e.record.start),
                  "text at " + Text(e.record.start));
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
              r.value == heard->value && (type != AN_TYPE_HILITE || r.style == heard->style) &&
              (type != AN_TYPE_HILITE || Same(heard->start, heard->end) || Same(r.end, heard->end)),
          "the new entry is not what the callback heard");
    for (size_t j = i; j < before.size(); ++j)
        CHECK(after[j + 1].slot == before[j].slot, "adding moved slot " + N(before[j].slot));
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
        return flags == 0 ? (tag & ANTAG_PROTECTED) == 0
               : (flags & ANCLEAR_EQUAL) != 0
                   ? tag == value
                   : (flags & ANCLEAR_MASK) != 0 && (tag & value) == value;
    };
    const std::vector<Entry> before = ListEntries(d.handle);
    const std::vector<uint8_t> bytes = TableBytes(d.handle);
    const uint32_t rc = CALL(ANClearAnnos(d.handle, flags, value));
    const std::vector<Entry> after = ListEntries(d.handle);
    const std::vector<Note> &notes = d.recorder.notes;
    for (const Note &n : notes)
        CHECK(n.code == ANNOTIFY_REMOVED && selected(n.record.tag),
              "notification " + N(n.code) + " for tag " + N(n.record.tag));
    if (Unheld(d, rc == AN_ERR_NOSTATE && notes.empty(), rc)) return;
    std::vector<Entry> kept;
    std::copy_if(before.begin(), before.end(), std::back_inserter(kept),
                 [&](const Entry &e) { return !selected(e.record.tag); });
    const size_t chosen = before.size() - kept.size();
    if (chosen == 0) {  // also when there was nothing: then the table goes
        CHECK(rc == 0 && notes.empty() &&
                  (before.empty() ? !HasTable(d.handle) : bytes == TableBytes(d.handle)),
              "a clear that selects nothing gave " + N(rc) + " or changed something");
        return;
    }
    for (const Entry &e : after) CHECK(!selected(e.record.tag), "slot " + N(e.slot) + " survived");
    CHECK(notes.size() <= chosen, N(notes.size()) + " removals announced for " + N(chosen));
    const uint32_t last = notes.empty() ? 0 : notes.back().returned;
    CHECK(d.callback ? !notes.empty() && rc == last : rc == 0 && notes.empty(),
          "result " + N(rc) + ", " + N(notes.size()) + " removals, the last said " + N(last));
    if (after.empty()) CHECK(!HasTable(d.handle), "an emptied table was kept");
    // The annotation text at every anchor loses exactly the units of the removed texts.
    for (const Entry &e : before)
        CHECK(!IsText(e) || AnchorText(after, e.record.start) == AnchorText(kept, e.record.start),
              "text at " + Text(e.record.start));
}

void Run::ClearUserData(Document &d) {
    trail.back() += ": clear userData";
    auto owned = [&] {
        std::set<uint64_t> blocks;
        for (const Entry &e : ListEntries(d.handle))
            if (e.ownsUserData && e.record.userData != 0) blocks.insert(e.record.userData);
        for (const uint64_t block : annotest::KeptBlocks(d.handle)) blocks.insert(block);
        return blocks;
    };
    const std::set<uint64_t> before = owned();
    const uint32_t rc = CALL(ANClearUserData(d.handle));
    const std::set<uint64_t> still = owned();
    for (uint64_t block : before)
        if (still.count(block) == 0) d.blocks.erase(block);
    CHECK(faulty_ || (rc == 0 && still.empty()), N(rc) + ", " + N(still.size()) + " blocks left");
}

// ---- Reading -------------------------------------------------------------------------------

void Run::Track(Document &d) {
    std::vector<ANPos> positions = WalkPositions(d, false);
    for (const Entry &e : ListEntries(d.handle))
        positions.insert(positions.end(), {e.record.start, e.record.end});
    for (uint32_t extra = in_.below(4); extra > 0; --extra) positions.push_back(PickPos(in_, d));
    std::stable_sort(positions.begin(), positions.end(),
                     [](const ANPos &x, const ANPos &y) { return Cmp(x, y) < 0; });
    const size_t from = in_.below(positions.size());
    const uint32_t skip = in_.below(4);  // in quarters: how many positions to leave out
    const ANPos start = in_.chance(40) ? PickPos(in_, d) : positions[from];
    std::vector<ANPos> visit;
    for (const ANPos &p : positions)
        if (Cmp(p, start) >= 0 && (skip == 0 || in_.below(4) >= skip)) visit.push_back(p);
    const uint32_t markLeft = in_.chance(32) ? 1 : 0;
    trail.back() += ": tracking walk from " + Text(start) + " over " + N(visit.size());
    if (!faulty_) return CheckTrackingWalk(d.handle, start, visit, markLeft);
    ANTrackInfo track{};
    CALL(ANStartAnnoTrack(d.handle, &start, &track));
    for (const ANPos &p : visit) CALL(ANTrackAnno(d.handle, &p, &track));
}

void Run::TextReads(Document &d) {
    std::vector<ANPos> positions;
    const std::vector<std::pair<ANPos, uint32_t>> anchors = TextAnchors(ListEntries(d.handle));
    const uint32_t count = 1 + in_.below(24);
    for (uint32_t i = 0; i < count; ++i) {
        if (anchors.empty() || !in_.chance(200)) {
            positions.push_back(PickPos(in_, d));
            continue;
        }
        auto [p, units] = anchors[in_.below(anchors.size())];
        p.kind = in_.chance(240) ? ANPOS_ANNOTEXT : 0;
        p.textIndex = in_.below(units + 2);
        if (in_.chance(16)) p.subItemId = p.subItemId == ANPOS_NOSUBITEM ? 0 : ANPOS_NOSUBITEM;
        positions.push_back(p);
    }
    trail.back() += ": " + N(count) + " text reads";
    CheckTextReads(d.handle, positions, faulty_);
}

void Run::Event(Document &d) {
    static constexpr uint32_t kEvents[] = {
        ANEVENT_CLICK1, ANEVENT_CLICK2, ANEVENT_CLICK3, ANEVENT_MOVE,  ANEVENT_MOVE,
        ANEVENT_MOVE,   0x03,           ANEVENT_ENTER,  ANEVENT_LEAVE, 0x40};
    const uint32_t event = in_.chance(250) ? kEvents[in_.below(10)] : in_.u32();
    const ANPos pos = PickPos(in_, d);
    uint16_t entry = AN_NONE;
    const uint32_t how = in_.below(8);
    const std::vector<Entry> list = ListEntries(d.handle);
    ANTrackInfo track{};  // for where a viewer's tracking stands at the position
    if (how < 4 && CALL(ANStartAnnoTrack(d.handle, &pos, &track)) == ANTRACK_ACTIVE)
        entry = track.cursor;
    if (how >= 4 && how < 6 && !list.empty()) entry = list[in_.below(list.size())].slot;
    if (how == 6) entry = static_cast<uint16_t>(in_.below(40));
    trail.back() += ": event " + N(event) + " from slot " + N(entry) + " at " + Text(pos);
    ANPos hoverPos{}, hoverAfter{};
    const uint16_t hoverEntry = annotest::HoverEntry(d.handle, &hoverPos);
    const uint32_t rc = CALL(ANAnnoEvent(d.handle, event, entry, &pos));
    if (Unheld(d, rc == 0 && d.recorder.notes.empty(), rc)) return;
    CheckEvent(list, event, entry, pos, hoverEntry, hoverPos, d.callback, d.recorder.notes, rc);
    const bool live = entry == AN_NONE || SlotIndex(list)[entry] >= 0;
    const bool moved = !list.empty() && live && event == ANEVENT_MOVE &&
                       !(entry == AN_NONE && hoverEntry == AN_NONE);
    const uint16_t entryAfter = annotest::HoverEntry(d.handle, &hoverAfter);
    CHECK(moved ? entryAfter == entry && Same(hoverAfter, pos)
                : entryAfter == hoverEntry && Same(hoverAfter, hoverPos),
          "hover entry " + N(entryAfter) + " at " + Text(hoverAfter) + " after the event");
}

void Run::Find(Document &d) {
    static constexpr uint16_t kTests[] = {ANFIND_MASK, ANFIND_EQUAL, ANFIND_MASK | ANFIND_EQUAL, 0};
    ANFindRecord find;
    std::memset(&find, 0x3C, sizeof find);
    find.size = in_.chance(245) ? ANFINDRECORD_SIZE : in_.below(129);
    find.mode = static_cast<uint16_t>(in_.below(8) | kTests[in_.below(4)] |
                                      (in_.chance(16) ? in_.u16() & 0xCF00 : 0));
    find.tag = PickTag(in_);
    find.key = PickPos(in_, d);
    find.foundEnd = PickPos(in_, d);
    const uint16_t flags = static_cast<uint16_t>(in_.chance(240) ? in_.below(2) : in_.u16());
    trail.back() += ": find mode " + N(find.mode) + " flags " + N(flags) + " tag " + N(find.tag) +
                    " key " + Text(find.key);
    const ANFindRecord before = find;
    const uint32_t rc = CALL(ANFindAnno(d.handle, flags, &find));
    const bool untouched = std::memcmp(&before, &find, sizeof find) == 0;
    const bool refused =
        rc == AN_ERR_NOSTATE || (before.size != ANFINDRECORD_SIZE && rc == AN_ERR_BADARG);
    // Under a failure the answer is still right, or the failure's code (99 and up).
    if (faulty_ ? rc >= 99 || !Bound(d) || settings.sweep : Unheld(d, untouched && refused, rc))
        return;
    ClearFailures();  // the reading must not meet the failure
    ANFindRecord expected{};
    bool startKnown = true;
    const uint32_t want = ExpectedFind(d.handle, flags, before, &expected, &startKnown);
    CHECK(rc == want && (rc == 0 || untouched), "result " + N(rc) + ", expected " + N(want));
    if (rc != 0) return;
    CHECK(find.foundTag == expected.foundTag && find.foundUserData == expected.foundUserData &&
              Same(find.foundEnd, expected.foundEnd) &&
              (!startKnown || Same(find.foundStart, expected.foundStart)) &&
              find.size == before.size && find.mode == before.mode && find.tag == before.tag &&
              Same(find.key, before.key),
          "found tag " + N(find.foundTag) + " at " + Text(find.foundStart) + ", or inputs written");
}

void Run::Map(Document &d) {
    static constexpr uint32_t kFlags[] = {ANMAP_ORDINAL_TO_POS, ANMAP_POS_TO_ORDINAL, 3, 0};
    ANMapRecord map;
    std::memset(&map, 0x11, sizeof map);
    map.size = in_.chance(245) ? ANMAPRECORD_SIZE : in_.below(129);
    map.flags = in_.chance(245) ? kFlags[in_.below(4)] : in_.u32();
    uint32_t characters = 0;
    for (const antk::ItemView &item : d.items) characters += item.charCount;
    map.ordinal = in_.below(characters + 3);
    map.pos = PickPos(in_, d), map.pos.kind = in_.u32(), map.pos.textIndex = in_.u32();
    trail.back() += ": map " + N(map.flags) + " ordinal " + N(map.ordinal) + " " + Text(map.pos);
    const ANMapRecord before = map;
    const uint32_t rc = CALL(ANMapPosition(d.handle, &map));
    CHECK(map.size == before.size && map.flags == before.flags && map.pos.kind == before.pos.kind &&
              map.pos.textIndex == before.pos.textIndex &&
              (rc == 0 || std::memcmp(&before, &map, sizeof map) == 0),
          "mapping gave " + N(rc) + " and wrote what it must not");
    if (Unheld(d, rc == AN_ERR_NOSTATE || rc == AN_ERR_BADARG, rc)) return;
    const bool bad = map.size != ANMAPRECORD_SIZE || (map.flags & 3) == 0;
    CHECK(bad ? rc == AN_ERR_BADARG : rc == 0 || rc == AN_ERR_NOTFOUND || rc == AN_ERR_NOSTATE,
          "mapping gave " + N(rc));
}

// ---- Styles, copying, building -------------------------------------------------------------

void Run::Styles(Document &d) {
    const uint32_t size = in_.chance(200)   ? ANHILITESTYLE_SIZE
                          : in_.chance(200) ? ANHILITESTYLE_SIZE_OLD
                                            : in_.below(129);
    ANHiliteStyle style = NewStyle(in_, size, 12, 0xFFFFFFFF, true);
    const bool good = size == ANHILITESTYLE_SIZE || size == ANHILITESTYLE_SIZE_OLD;
    ANHiliteStyle stored = style;  // an old-size style reads back with attr2 0xFFFF
    if (size == ANHILITESTYLE_SIZE_OLD)
        stored.size = ANHILITESTYLE_SIZE, stored.attr2 = 0xFFFF, stored.reserved = 0;
    const uint32_t how = in_.below(2);  // the global table (if any), the document's
    trail.back() += ": styles " + N(how) + " id " + N(style.styleId) + " size " + N(size);
    const bool global = how == 0;
    const uint32_t rc =
        CALL(global ? ANAddGlobalHiliteStyle(global_, &style) : ANAddHiliteStyle(d.handle, &style));
    if (faulty_) return;
    if (!global && d.noStylesMaybe && rc == AN_ERR_BADARG) return;  // it may have no style table
    if (!global && rc == 0) d.noStylesMaybe = false;
    const uint32_t want = global      ? (global_ == nullptr || !good ? AN_ERR_BADARG : 0)
                          : !Bound(d) ? AN_ERR_NOSTATE
                          : !good     ? AN_ERR_BADARG
                                      : 0;
    CHECK(rc == want, "adding a style gave " + N(rc) + ", not " + N(want));
    if (rc != 0) return;
    ANHiliteStyle got{};
    const uint32_t found = CALL(global ? ANGetGlobalHiliteStyle(global_, style.styleId, &got)
                                       : ANGetHiliteStyle(d.handle, style.styleId, &got));
    CHECK(found == (global ? 0u : 1u) && std::memcmp(&got, &stored, sizeof got) == 0,
          "style " + N(style.styleId) + " reads back otherwise: " + N(found));
}

void Run::Copy(Document &) {
    Document *dest = in_.chance(128) ? &a_ : &b_;
    Document *src = in_.chance(200) ? (dest == &a_ ? &b_ : &a_) : dest;
    trail.back() = std::string("copy ") + Name(*src) + " to " + Name(*dest) +
                   (faulty_ ? " with a failure armed" : "");
    const std::vector<Entry> source = ListEntries(src->handle);
    const std::vector<Entry> target = ListEntries(dest->handle);
    // Copies back and forth double tables and texts: past a few thousand, only time is tested.
    size_t units = source.size() + target.size();
    for (const auto *list : {&source, &target})
        for (const Entry &e : *list) units += e.text.size();
    if (units > 2000) return;
    const uint32_t rc = CALL(ANCopyAnnos(dest->handle, src->handle));
    CHECK(dest->recorder.notes.empty() && src->recorder.notes.empty(), "copying notified");
    if (src != dest)
        CHECK(SameListing(source, ListEntries(src->handle)), "copying changed the source");
    if (faulty_) return;
    const uint32_t want = !Bound(*src) || (!source.empty() && !Bound(*dest)) ? AN_ERR_NOSTATE : 0;
    CHECK(rc == want, "copying gave " + N(rc) + ", not " + N(want));
    if (rc != 0) return;
    const std::vector<Entry> after = ListEntries(dest->handle);
    if (source.empty() || src == dest) {
        CHECK(SameListing(target, after), "copying nothing, or onto itself, changed the target");
        return;
    }
    // The destination's annotation text at every anchor, then the source's.
    std::map<std::pair<uint32_t, uint32_t>, std::u16string> texts[3];
    for (int k = 0; k < 3; ++k)
        for (const Entry &e : k == 0 ? source : k == 1 ? target : after)
            if (IsText(e))
                texts[k][{e.record.start.itemId, e.record.start.subItemId}] +=
                    e.type == AN_TYPE_TEXT ? e.text : u"\xFFFF";
    for (int k = 0; k < 2; ++k)
        for (const auto &[at, text] : texts[k])
            CHECK(texts[2][at] == texts[1][at] + texts[0][at],
                  "copied annotation text at " + N(at.first) + "." + N(at.second));
    if (!target.empty()) return;
    // Into an empty document: every point, highlight and cut marker once more (texts and
    // ranges may join).
    CHECK(after.size() <= source.size(), "made " + N(after.size()) + " of " + N(source.size()));
    std::vector<bool> used(after.size());
    for (const Entry &y : source) {
        if (IsText(y) || y.type == AN_TYPE_RANGE) continue;
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

void Run::Build(Document &d) {
    trail.back() += ": build";
    const uint32_t rc = CALL(ANBuildAnnos(d.handle));
    for (const Note &n : d.recorder.notes)
        CHECK(n.code == ANNOTIFY_ADDED && n.detail == AN_TYPE_HILITE &&
                  (n.record.tag & 0x80000000u) != 0,
              "a built annotation's notification, tag " + N(n.record.tag));
    if (Unheld(d, rc == AN_ERR_NOSTATE, rc)) return;
    const uint32_t cursor = annotest::BuildCursor(d.handle);
    CHECK(rc == 0 && cursor == d.ranges, "building gave " + N(rc) + ", buildCursor " + N(cursor));
}

void Run::Step(Document &d) {
    trail.back() += ": stepping";
    if (!faulty_ && Bound(d)) {
        // The merged walk meets every content position in order, text only where there is some.
        const std::vector<ANPos> walk = WalkPositions(d, true);
        std::vector<ANPos> textAnchors, visited;  // visited: content and text anchors met
        for (const auto &a : TextAnchors(ListEntries(d.handle))) textAnchors.push_back(a.first);
        auto isContent = [&](const ANPos &p) { return AtAnchor(d.content, p); };
        for (const ANPos &p : walk) {
            const bool inText = p.kind == ANPOS_ANNOTEXT;
            CHECK(AtAnchor(textAnchors, p) || (!inText && isContent(p)), "the walk met " + Text(p));
            if (!inText) visited.push_back(p);
        }
        // Up to the first text anchor that is not content (a text item itself, or a place the
        // chunker does not have; from there stepping goes as the chunker answers).
        const auto s = std::find_if_not(walk.begin(), walk.end(), isContent);
        const ANPos stray = s == walk.end() ? ANPos{0xFFFFFFFFu, 0xFFFFFFFFu, 0, 0} : *s;
        for (const ANPos &c : d.content) {
            CHECK(Cmp(c, walk.front()) <= 0 || Cmp(stray, c) < 0 || AtAnchor(visited, c),
                  "the walk missed " + Text(c));
        }
    }
    // Single steps from anywhere, by each stepping call, some without a document.
    for (uint32_t k = 1 + in_.below(6); k > 0; --k) {
        const ANPos p = PickPos(in_, d);
        ANPos next;
        std::memset(&next, 0x66, sizeof next);
        const ANPos untouched = next;
        const uint32_t how = in_.below(4);
        const bool text = p.kind == ANPOS_ANNOTEXT;
        const DAHandle doc = how == 3 || (how == 1 && text && in_.chance(128)) ? nullptr : d.handle;
        const uint32_t rc = CALL(how == 0   ? ANNextPos(doc, &p, &next)
                                 : how == 2 ? ANNextAnnoTextPos(doc, &p, &next)
                                            : ANNextChunkerPos(doc, &p, &next));
        const std::string said =
            "step " + N(how) + " gave " + N(rc) + " from " + Text(p) + " to " + Text(next);
        CHECK(how != 3 || text || rc == AN_ERR_BADARG, said);
        if (how == 3 || faulty_) continue;
        CHECK(how == 0
                  ? (rc == 0 ? Cmp(next, p) > 0 : rc == AN_ERR_NOTFOUND && Same(next, untouched))
              : how == 1 && text ? rc == 0 && Same(next, (ANPos{p.itemId, p.subItemId, 0, 0}))
              : !Bound(d)        ? rc == AN_ERR_NOSTATE
              : rc != 0          ? rc == AN_ERR_NOTFOUND
              : how == 1         ? Cmp(next, p) > 0 && next.kind == 0 && next.textIndex == 0
                                 : next.kind == ANPOS_ANNOTEXT,
              said);
    }
}

void Run::Callback(Document &d) {
    const bool on = in_.chance(180);
    trail.back() += on ? ": callback on" : ": callback off";
    const uint32_t rc = CALL(ANSetCallback(d.handle, on ? Notify : nullptr, &d.recorder));
    if (rc == 0) d.callback = on;
    if (faulty_) return;
    CHECK(rc == (Bound(d) ? 0u : AN_ERR_NOSTATE), "ANSetCallback gave " + N(rc));
}

void Run::Lifecycle(Document &d) {
    const uint32_t how = in_.below(4);
    trail.back() += ": lifecycle " + N(how);
    if (how == 0 && !Bound(d)) return Bind(d, in_.chance(200));
    const uint32_t rc = CALL(ANDeInit(d.handle));
    if (!faulty_) CHECK(rc == 0 && !Bound(d), "ANDeInit gave " + N(rc));
    if (how != 3 && !Bound(d)) Bind(d, in_.chance(200));
}

void Run::ArmFailure(Document &) {
    armNext_ = true;
    const uint32_t n = 1 + in_.below(48);
    pendingSticky_ = in_.chance(64);
    const bool allocation = in_.chance(128);
    if (!allocation)
        pendingCode_ =
            in_.chance(128) ? 99 : 100 + in_.below(30);  // none of the library's own codes
    (allocation ? pendingAllocation_ : pendingCall_) = n;
    trail.back() += (allocation ? ": arm allocation failure "
                                : ": arm failure code " + N(pendingCode_) + " at call ") +
                    N(n) + (pendingSticky_ ? " and on" : "");
}

void Run::Fill(Document &d) {
    // `fillers` entries of every type but ranges (their count varies), by a fixed sequence.
    uint32_t seed = 12345;
    for (uint32_t i = 0; i < settings.fillers && Bound(d); ++i) {
        seed = seed * 1103515245u + 12345u;
        const ANPos at = d.content[(seed >> 8) % d.content.size()];
        const ANPos to = d.content[(seed >> 16) % d.content.size()];
        const bool ordered = Cmp(at, to) <= 0;
        ANAnnoRecord r{};
        r.size = AN_RECORD_SIZE_POINT, r.tag = 0x100 + i % 8, r.start = ordered ? at : to;
        r.end = ordered ? to : at, r.value = i, r.style = 0x40000000u | (1 + i % 10);
        const uint16_t type = i % 7 == 2 ? AN_TYPE_HILITE : static_cast<uint16_t>(1 + i % 7);
        const uint16_t unit = static_cast<uint16_t>('a' + i % 26);
        ANTextDesc t{48, r.tag, at, 0, &unit, 1, 0};
        ANPointDesc p{32, r.tag, r.start, 0};
        const void *desc = type == AN_TYPE_TEXT ? static_cast<const void *>(&t) : &r;
        if (type == AN_TYPE_PLACEHOLDER || type == AN_TYPE_CUTMARK) desc = &p;
        const uint32_t rc = CALL(ANAddAnno(d.handle, type, desc));
        CHECK(type == AN_TYPE_TEXT || rc == 0, "adding a filler gave " + N(rc));
    }
}

void Run::Finish() {
    if (settings.disarm) settings.disarm();
    SetContext("finishing the input");
    trail.push_back("finish");
    ClearFailures();
    for (Document *d : {&a_, &b_}) {
        if (Bound(*d)) {
            faulty_ = false;
            ClearUserData(*d);
            CHECK(CALL(ANDeInit(d->handle)) == 0, "ANDeInit");
        }
        for (uint64_t block : d->blocks) annotest::FreeHeapBlock(block);
        d->blocks.clear();
    }
    CHECK(antk::openSecondaryDocuments() == 0 && antk::openContents() == 0, "content left open");
    antk::destroyDocument(a_.handle);
    antk::destroyDocument(b_.handle);
    if (global_ != nullptr)
        CHECK(CALL(ANDeInitGlobalHiliteStyles(global_)) == 0, "freeing the global styles");
    CHECK(annotest::HeapBlocks() == heapAtStart_ && annotest::GlobalBlocks() == globalAtStart_,
          "heap or global blocks leaked");
#if ANNO_FUZZ_PLATFORM_CONTROLS
    CHECK(anwin::globalLocks() == 0, "global blocks left locked");
#endif
}

}  // namespace

}  // namespace annofuzz

void annofuzz::RunInput(const uint8_t *data, size_t size) {
    Input in(data, size);
    Run(in).Go();
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    annofuzz::RunInput(data, size);
    return 0;
}
