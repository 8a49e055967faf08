// Hostile callers of all 28 exports: each row gets its documented result, changes no document,
// announces nothing and reads nothing past what it is given.
#include <algorithm>
#include <array>
#include <cstring>
#include <functional>

#include "support/fixture.h"
#include "support/table_view.h"

namespace {

using namespace annotest;  // NOLINT(google-build-using-namespace)

// Not the library's: X not tried, kMixed a row's calls disagreed, kWrote a record was written.
constexpr uint32_t X = 0xF00D, kMixed = 0xBAD1, kWrote = 0xBAD2, kNone = ANPOS_NOSUBITEM;
const ANPos kText = TextPos(6, kNone, 0), kTop = TextPos(6, kNone, ~0u);  // text at item 6
// Past the document's end: one position of each kind but 5, and two of kind 5.
// clang-format off
const std::vector<ANPos> kBeyond = {{16, kNone, 0, 0}, {17, 0, 1, 1}, {0x10000, 7, 2, ~0u},
    {~0u >> 1, ~1u, 3, 0}, {~1u, kNone, 4, 7}, {~0u, 7, 6, 1}, {16, 1, ~0u, ~0u}};
const std::vector<ANPos> kBeyondText = {TextPos(16, kNone, 0), TextPos(~0u, ~0u, ~0u)};
// clang-format on

uint32_t All(const std::vector<uint32_t> &rcs) {
    return std::count(rcs.begin(), rcs.end(), rcs[0]) == std::ssize(rcs) ? rcs[0] : kMixed;
}
template <typename T, typename F>
uint32_t Each(const std::vector<T> &inputs, F call) {
    std::vector<uint32_t> rcs(inputs.size());
    std::transform(inputs.begin(), inputs.end(), rcs.begin(), call);
    return All(rcs);
}
std::vector<uint32_t> Upto(uint32_t from, uint32_t to, const std::vector<uint32_t> &but = {}) {
    std::vector<uint32_t> out;
    for (; from <= to; ++from)
        if (!std::count(but.begin(), but.end(), from)) out.push_back(from);
    return out;
}
// `call` (args..., &record): its result, or kWrote when it wrote the record.
template <typename T, typename F, typename... A>
uint32_t Kept(T record, F call, A... args) {
    std::array<char, sizeof record> before, after;
    std::memcpy(before.data(), &record, sizeof record);
    const uint32_t rc = call(args..., &record);
    std::memcpy(after.data(), &record, sizeof record);
    return before == after ? rc : kWrote;
}
// The same with records of every size from 0 to 128 but those `taken`, each copied from `model`
// into a block of exactly that size (at least its size field): a read past it is an ASan report.
template <typename T, typename F, typename... A>
uint32_t Sizes(const std::vector<uint32_t> &taken, const T &model, F call, A... args) {
    return Each(Upto(0, 128, taken), [&](uint32_t size) {
        std::vector<uint8_t> record(std::max(size, 4u)), before;
        std::memcpy(record.data(), &model, std::min(record.size(), sizeof model));
        std::memcpy(record.data(), &size, sizeof size);
        before = record;
        const uint32_t rc = call(args..., reinterpret_cast<T *>(record.data()));
        return record == before ? rc : kWrote;
    });
}
ANFindRecord Search(uint32_t m, ANPos key) { return {72, uint16_t(m), 0, 0, key, 0, {}, {}, 0}; }
uint32_t Find0(DAHandle d, ANFindRecord *f) { return ANFindAnno(d, 0, f); }
uint32_t Find(DAHandle d, uint32_t mode, ANPos key) { return Kept(Search(mode, key), Find0, d); }
uint32_t Map(DAHandle d, uint32_t flags, ANPos pos, uint32_t ordinal) {
    return Kept(ANMapRecord{ANMAPRECORD_SIZE, flags, pos, ordinal}, ANMapPosition, d);
}

struct Records {  // what a row passes
    ANPos at = Pos(2), to{};
    ANTrackInfo track{};
    ANAnnoTextTrack never{}, live{};  // text tracks never started (or ended: zeroed), started
    ANHiliteStyle style{ANHILITESTYLE_SIZE, 9, 0, 0, 0, 0, 0, 0};
    ANFindRecord find = Search(ANFIND_FIRST | ANFIND_MASK, Pos(3));
    ANMapRecord map{ANMAPRECORD_SIZE, ANMAP_POS_TO_ORDINAL, Pos(2), 0};
    uint16_t unit = 0;
    Records() { ANStartAnnoTextTrack(nullptr, &live); }
    ~Records() { ANEndAnnoTextTrack(nullptr, &live); }
};
// An export with hostile arguments, named by its own text, and its results with a null document,
// one without annotation state, the bound one with a table and a bound one without.
using Call = std::function<uint32_t(DAHandle, Records &)>;
using Row = std::tuple<const char *, Call, std::vector<uint32_t>>;
// clang-format off
#define ROW(n0, n1, n2, n3, ...) {#__VA_ARGS__, [&]([[maybe_unused]] DAHandle d,                   \
    [[maybe_unused]] Records &r) -> uint32_t { return __VA_ARGS__; }, {n0, n1, n2, n3}}
#define FOR(values, ...) Each(values, [&](const auto &v) -> uint32_t { return __VA_ARGS__; })
// clang-format on

// Documents of 16 plain items: without annotation state, bound with a table of every type and
// with text at item 6, bound without a table. Style 7 is global, 8 the bound document's own.
class Hostile : public LeakCheckedTest {
 protected:
    void SetUp() override {
        LeakCheckedTest::SetUp();
        const ANHiliteStyle s7{ANHILITESTYLE_SIZE, 7, ANSTYLE_COLOR1, 0x112233, 0, 1, 2, 0};
        const ANHiliteStyle s8{ANHILITESTYLE_SIZE, 8, ANSTYLE_COLOR1, 0x445566, 0, 1, 2, 0};
        // clang-format off
        for (uint32_t rc :
             {ANInitGlobalHiliteStyles(&global_), ANAddGlobalHiliteStyle(global_, &s7),
              ANInit(doc_, global_, Notifications::Callback, &notes_), ANAddHiliteStyle(doc_, &s8),
              ANInit(empty_, nullptr, Notifications::Callback, &notes_), AddMark(doc_, 7, Pos(9)),
              AddHilite(doc_, Pos(1), Pos(4), 1, 0x40000007, 0, 0xFF), AddText(doc_, Pos(6), u"ab"),
              AddPoint(doc_, Pos(2)), AddPoint(doc_, Pos(3), 1, 0, 4), AddMark(doc_, 6, Pos(6)),
              AddText(doc_, Pos(6), u"cd"), AddRange(doc_, Pos(5), Pos(8)),
              // At the greatest text index, where shifts for text inserted before stop:
              AddPoint(doc_, kTop), AddPoint(doc_, TextPos(6, kNone, ~1u)), AddMark(doc_, 7, kTop),
              AddText(doc_, TextPos(6, kNone, 1), u"xyz")})
            ASSERT_EQ(rc, AN_OK);
        // clang-format on
        notes_ = {{}, 7};  // nothing heard yet; a delivered event would show in the result
    }
    void TearDown() override {
        for (DAHandle d : {bare_, doc_, empty_}) Doc closing(d);  // rules kept; unbound, destroyed
        EXPECT_EQ(ANDeInitGlobalHiliteStyles(global_), AN_OK);
        LeakCheckedTest::TearDown();
    }
    DAHandle bare_ = PlainDocument(16), doc_ = PlainDocument(16), empty_ = PlainDocument(16);
    ANStyleTable *global_ = nullptr;
    Notifications notes_;
};

TEST_F(Hostile, EveryExportAnswersHostileArgumentsAsDocumented) {
    const ANAnnoRecord point{72, 1, Pos(14), Pos(14), 0, 0, 0, 0, {}, 0, 0, nullptr, 0, 0};
    const ANTextDesc nullText{sizeof(ANTextDesc), 1, Pos(2), 0, nullptr, 3, 0};
    const std::vector<std::vector<uint32_t>> taken = {
        {}, {72, 60, 48}, {72, 64, 32}, {48, 44, 40}, {72, 64}, {48}, {32, 28}, {32, 28}};
    const std::vector<Entry> list = ListEntries(doc_);
    std::vector<uint32_t> oddModes, unlisted = Upto(0, AN_NONE - 1);  // slots naming no entry
    for (uint32_t m = 0; m <= 0xFFFF; ++m)  // kinds outside 1 to 6, or no tag test
        if ((m & 0xFF) - 1 >= 6 || !(m & 0x3000)) oddModes.push_back(m);
    for (const Entry &e : list) std::erase(unlisted, e.slot);
    // clang-format off
    const std::vector<Row> rows = {
        ROW(0, X, X, X, ANInit(nullptr, global_, nullptr, nullptr)),
        ROW(15, 0, X, X, ANDeInit(d)),
        ROW(15, 18, X, X, ANSetCallback(d, nullptr, nullptr)),
        ROW(15, 18, X, X, ANAddAnno(d, AN_TYPE_POINT, &point)),
        ROW(15, 15, 15, 15, All({FOR(Upto(1, 7), ANAddAnno(d, uint16_t(v), nullptr)),
            FOR(Upto(0, 0xFFFF, Upto(1, 7)), ANAddAnno(d, uint16_t(v), &point)),
            FOR(Upto(1, 7), Sizes(taken[v], point, ANAddAnno, d, uint16_t(v))),
            ANAddAnno(d, AN_TYPE_TEXT, &nullText)})),
        // Text past its anchor's text, or where the next unit's step would wrap round, is refused.
        ROW(15, 18, 15, 15, FOR(std::vector<ANPos>({TextPos(6, kNone, 9), kTop, Pos(6, ~1u),
            TextPos(3, kNone, 1), TextPos(16, kNone, 1)}), AddText(d, v, u"t") | AddMark(d, 6, v))),
        // What stops at the greatest text index keeps no extent there.
        ROW(3, X, X, X, std::count_if(list.begin(), list.end(),
            [&](const Entry &e) { return e.record.start == kTop && e.record.end == kTop; })),
        ROW(15, 18, 0, 0, FOR(Upto(1, 0xFFFF), ANClearAnnos(d, uint16_t(v), ~0u))),
        ROW(15, 0, 0, 0, ANClearUserData(d)),
        ROW(15, 15, 15, 15, ANCopyAnnos(d, nullptr)),
        ROW(15, 18, 0, X, All({ANCopyAnnos(doc_, d), ANCopyAnnos(d, doc_)})),
        ROW(0, 0, 0, 0, ANCopyAnnos(d, empty_)),
        ROW(15, 18, 0, 0, ANBuildAnnos(d)),
        ROW(1, X, X, X,
            FOR(kBeyond, ANIsAnnoTextPos(&v) * 2 + ANIsAnnoTextPos(&kTop) + ANCompPos(&v, &v))),
        ROW(25, 25, 25, 25, All({ANNextPos(d, nullptr, &r.to), ANNextPos(d, &r.at, nullptr),
            FOR(kBeyond, Kept(ANPos{}, ANNextPos, d, &v))})),
        ROW(15, 15, 15, 15, All({ANNextChunkerPos(d, nullptr, &r.to), ANNextAnnoTextPos(d, &r.at,
            nullptr), ANNextChunkerPos(d, &r.at, nullptr), ANNextAnnoTextPos(d, nullptr, &r.to)})),
        ROW(15, 18, 25, 25, FOR(kBeyond,
            All({ANNextChunkerPos(d, &v, &r.to), ANNextAnnoTextPos(d, &v, &r.to)}))),
        ROW(15, 18, 15, 15, All({ANMapPosition(d, nullptr), Sizes({28}, r.map, ANMapPosition, d),
            FOR(Upto(2, 31), Map(d, 1u << v, Pos(2), 0))})),
        ROW(15, 18, 25, 25, All({FOR(Upto(0, 999), Map(d, 1, {}, v) | Map(d, 1, {}, ~v)),
            FOR(kBeyond, Map(d, 2, Pos(v.itemId | 0x10000, v.subItemId), 0))})),
        ROW(15, X, X, X, All({ANInitGlobalHiliteStyles(nullptr),
            ANDeInitGlobalHiliteStyles(nullptr), ANGetGlobalHiliteStyle(nullptr, 7, &r.style),
            ANAddGlobalHiliteStyle(nullptr, &r.style), ANAddGlobalHiliteStyle(global_, nullptr),
            Sizes({24, 28}, r.style, ANAddGlobalHiliteStyle, global_)})),
        ROW(25, X, X, X, ANGetGlobalHiliteStyle(global_, 7, nullptr)
            + Kept(r.style, ANGetGlobalHiliteStyle, global_, ~0u)),
        ROW(0, 0, 2, 0, ANGetHiliteStyle(d, 7, nullptr) + ANGetHiliteStyle(d, 8, &r.style)),
        ROW(0, 0, 0, 0, Kept(r.style, ANGetHiliteStyle, d, ~0u)),
        ROW(15, 18, 15, 15,
            All({ANAddHiliteStyle(d, nullptr), Sizes({24, 28}, r.style, ANAddHiliteStyle, d)})),
        ROW(0, 0, 2, 0, ANStartAnnoTrack(d, &r.at, &r.track)),
        ROW(0, 0, X, X, Kept(r.track, ANStartAnnoTrack, d, &r.at)),
        ROW(0, 0, 0, 0, All({Kept(r.track, ANStartAnnoTrack, d, nullptr),
            ANStartAnnoTrack(d, &r.at, nullptr), Kept(r.track, ANEndAnnoTrack, d),
            ANEndAnnoTrack(d, nullptr)})),
        // Any cursor and highlight slot stay inside the table; a cursor past every table is none.
        ROW(0, 0, 0, 0, FOR(Upto(0, 0xFFFF), (r.track = {}, r.track.cursor = uint16_t(v),
            r.track.hiliteEntry = v < 65530 ? uint16_t(v * 7) : AN_NONE,
            ANTrackAnno(d, &r.at, &r.track) & (v < 65530 ? ~0x3Fu : ~0u)))),
        ROW(15, 15, 15, 15, ANStartAnnoTextTrack(d, nullptr)),
        ROW(0, 0, 0, 0, All({ANEndAnnoTextTrack(d, &r.never), ANEndAnnoTextTrack(d, nullptr),
            ANStartAnnoTextTrack(d, &r.never), ANEndAnnoTextTrack(d, &r.never)})),
        // A slot naming no entry delivers nothing and leaves the hover alone.
        ROW(0, 0, 0, 0, FOR(unlisted, Each(Upto(1, 32, {4, 8}), [&](uint32_t e) {
            return ANAnnoEvent(d, e, v, &r.at); }))),
        ROW(0, 0, 0, 0, FOR(Upto(0, 256, {1, 2, 16, 32}), ANAnnoEvent(d, v, list[0].slot, &r.at)
            | ANAnnoEvent(d, ~v, list[0].slot, &kText) | ANAnnoEvent(d, v & 16, 0, nullptr))),
        ROW(15, 15, 15, 15, All({ANGetAnnoText(d, &r.never, &kText, &r.unit),  // not started
            ANGetAnnoText(d, nullptr, &kText, &r.unit), ANGetAnnoText(d, &r.live, nullptr, &r.unit),
            ANGetAnnoText(d, &r.live, &kText, nullptr)})),
        ROW(15, 18, 5, 25, ANGetAnnoText(d, &r.live, &kText, &r.unit)),
        ROW(15, 18, 25, 25, FOR(kBeyondText, Kept(r.unit, ANGetAnnoText, d, &r.live, &v))),
        ROW(15, 18, 0, 25, ANFindAnno(d, 0, &r.find)),
        ROW(15, 15, 15, 15, All({ANFindAnno(d, 0, nullptr), Sizes({72}, r.find, Find0, d)})),
        ROW(15, 18, 25, 25, All({FOR(oddModes, Find(d, v, Pos(3))),
            FOR(kBeyond, Find(d, 0x1004, v) | Find(d, 0x1005, v) | Find(d, 0x1006, v))})),
    };
    // clang-format on
    auto state = [&] {  // what callers can see of each document: binding, hover, table, texts
        std::vector<uint32_t> s;
        for (DAHandle d : {bare_, doc_, empty_}) {
            ANPos p{};
            s.insert(s.end(), {HoverEntry(d, &p), p.itemId, p.subItemId, p.kind, p.textIndex});
            s.push_back(antk::annoSlot(d) != nullptr);
            for (uint8_t byte : TableBytes(d)) s.push_back(byte);
            for (const Entry &e : ListEntries(d)) s.insert(s.end(), e.text.begin(), e.text.end());
        }
        return s;
    };
    const DAHandle docs[] = {nullptr, bare_, doc_, empty_};
    for (const auto &[name, call, want] : rows) {
        for (int i = 0; i < 4; ++i) {
            if (want[i] == X) continue;
            SCOPED_TRACE(std::string(name) + " with document " + std::to_string(i));
            const std::vector<uint32_t> before = state();
            const size_t heard = notes_.calls.size();
            Records r;
            EXPECT_EQ(call(docs[i], r), want[i]);
            EXPECT_TRUE(state() == before && notes_.calls.size() == heard) << "changed, announced";
        }
    }
}

}  // namespace
