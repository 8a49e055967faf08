// Hostile callers of the 28 exports: null pointers, documents without annotation state or table,
// text tracks never started or already ended (bad types, sizes, modes, positions: fuzz decoder's).
#include <algorithm>
#include <cstring>
#include <functional>

#include "support/fixture.h"
#include "support/table_view.h"

namespace {

using namespace annotest;  // NOLINT(google-build-using-namespace)

// Not the library's: X not tried, kMixed a row's calls disagreed, kWrote a record was written.
constexpr uint32_t X = 0xF00D, kMixed = 0xBAD1, kWrote = 0xBA00, kNone = ANPOS_NOSUBITEM;
const ANPos kText = TextPos(6, kNone, 0), kTop = TextPos(6, kNone, ~0u);  // text at item 6
const ANPos kBad[] = {TextPos(6, kNone, 9), kTop, Pos(6, ~1u), TextPos(3, kNone, 1),
                      TextPos(16, kNone, 1)};  // where no annotation text may go
uint32_t All(const std::vector<uint32_t> &rcs) {
    return std::count(rcs.begin(), rcs.end(), rcs[0]) == std::ssize(rcs) ? rcs[0] : kMixed;
}
// `call` (args..., &record): its result, plus kWrote when it wrote the record.
template <typename T, typename F, typename... A>
uint32_t Kept(T record, F call, A... args) {
    T before;
    std::memcpy(&before, &record, sizeof record);
    const uint32_t rc = call(args..., &record);
    return rc + (std::memcmp(&before, &record, sizeof record) ? kWrote : 0);
}
struct Records {  // what a row passes
    ANPos at = Pos(2), past = Pos(16), to{};
    ANTrackInfo track{7, 7, 7, 7, 7, 0, 0, 0, 0, 0, {}, 0, 0, nullptr, 0, 0};
    ANAnnoTextTrack never{}, live{};  // text tracks never started, started
    ANHiliteStyle style{ANHILITESTYLE_SIZE, 9, 0, 0, 0, 0, 0, 0};
    ANFindRecord find{72, ANFIND_FIRST | ANFIND_MASK, 0, 0, Pos(3), 0, {}, {}, 0};
    uint16_t unit = 0;
    Records() { ANStartAnnoTextTrack(nullptr, &live); }
    ~Records() { ANEndAnnoTextTrack(nullptr, &live); }
};
// Hostile calls, named by their text, and their result with each document (null first).
using Call = std::function<uint32_t(DAHandle, Records &)>;
using Row = std::tuple<const char *, Call, std::vector<uint32_t>>;
// clang-format off
#define ROW(n0, n1, n2, n3, ...) {#__VA_ARGS__, [&]([[maybe_unused]] DAHandle d,                   \
    [[maybe_unused]] Records &r) -> uint32_t { return __VA_ARGS__; }, {n0, n1, n2, n3}}
#define FOR(from, to, ...) All([&] { std::vector<uint32_t> rcs;                                 \
    for (uint32_t v = from; v <= to; ++v) rcs.push_back(__VA_ARGS__); return rcs; }())
// clang-format on
// Documents of 16 plain items: without annotation state, bound with a table of every type and
// with text at item 6, bound without a table. Style 7 is global, 8 the bound document's own. Each
// row gets its documented result, changes no document and announces nothing.
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
    const uint16_t unit = 'u';  // text of 2^32 - 64 units and more has no 32-bit capacity
    const ANTextDesc huge{48, 1, Pos(12), 0, &unit, ~63u, 0}, on6{48, 1, Pos(6), 0, &unit, ~0u, 0};
    uint32_t desc[24] = {};  // each type's descriptor in two sizes only other types take
    const uint32_t bad[] = {40, 64, 48, 60, 72, 32, 48, 32, 72, 40, 48, 24, 72, 36};
    const std::vector<Entry> list = ListEntries(doc_);
    std::vector<bool> listed(AN_NONE + 1);
    for (const Entry &e : list) listed[e.slot] = true;
    // clang-format off
    const std::vector<Row> rows = {
        ROW(15, 0, X, X, All({ANClearUserData(d), ANDeInit(d)})),
        ROW(15, 18, X, X, All({ANSetCallback(d, nullptr, nullptr), ANAddAnno(d, 2, &point)})),
        // Text past its anchor's text, or where the next unit's step would wrap round, is refused.
        ROW(15, 18, 15, 15, FOR(0, 4, AddText(d, kBad[v], u"t") | AddMark(d, 6, kBad[v]))),
        // What stops at the greatest text index keeps no extent there.
        ROW(3, X, X, X, std::count_if(list.begin(), list.end(),
            [&](const Entry &e) { return e.record.start == kTop && e.record.end == kTop; })),
        ROW(15, 18, 0, 0, All({ANClearAnnos(d, ANCLEAR_EQUAL, ~0u), ANBuildAnnos(d)})),
        ROW(15, 18, 0, X, All({ANCopyAnnos(doc_, d), ANCopyAnnos(d, doc_)})),  // onto itself: 0
        ROW(0, 0, 0, 0, ANCopyAnnos(d, empty_)),  // no annotations: dest not looked at
        ROW(25, 25, 25, 25, All({ANNextPos(d, nullptr, &r.to), ANNextPos(d, &r.at, nullptr)})),
        ROW(25, 25, kWrote, kWrote, Kept(ANPos{}, ANNextPos, d, &r.at)),
        ROW(15, 18, 15, 15, All({ANMapPosition(d, nullptr), ANAddHiliteStyle(d, nullptr)})),
        ROW(15, 18, 13, 13, All({ANAddAnno(d, 5, &huge), ANAddAnno(d, 5, &on6)})),
        ROW(15, 15, 15, 15, FOR(0, 12, ANAddAnno(d, uint16_t(v < 4 ? v * 8 : ~v), &point))),
        ROW(15, 15, 15, 15, FOR(0, 13, (desc[0] = bad[v], ANAddAnno(d, 1 + v / 2, desc)))),
        ROW(15, 18, 25, 25, All({ANNextChunkerPos(d, &r.past, &r.to), ANNextAnnoTextPos(d, &r.past,
            &r.to), Kept(ANMapRecord{ANMAPRECORD_SIZE, 1, {}, 0}, ANMapPosition, d)})),
        ROW(15, X, X, X, All({ANInitGlobalHiliteStyles(nullptr),
            ANDeInitGlobalHiliteStyles(nullptr), ANGetGlobalHiliteStyle(nullptr, 7, &r.style),
            ANAddGlobalHiliteStyle(nullptr, &r.style), ANAddGlobalHiliteStyle(global_, nullptr)})),
        ROW(25, X, X, X, ANGetGlobalHiliteStyle(global_, 7, nullptr)
            + Kept(r.style, ANGetGlobalHiliteStyle, global_, ~0u)),
        ROW(0, 0, 2, 0, ANGetHiliteStyle(d, 7, nullptr) + ANGetHiliteStyle(d, 8, &r.style)
            + Kept(r.style, ANGetHiliteStyle, d, ~0u)),
        ROW(0, 0, kWrote + 2, kWrote, Kept(r.track, ANStartAnnoTrack, d, &r.at)),
        ROW(0, 0, 0, 0, All({ANInit(nullptr, global_, nullptr, nullptr), ANIsAnnoTextPos(&r.past),
            ANCompPos(&kTop, &kTop) + 0u, Kept(r.track, ANStartAnnoTrack, d, nullptr),
            ANStartAnnoTrack(d, &r.at, nullptr), Kept(r.track, ANEndAnnoTrack, d),
            ANEndAnnoTrack(d, nullptr), ANTrackAnno(d, nullptr, &r.track),
            ANTrackAnno(d, &r.at, nullptr), ANEndAnnoTextTrack(d, &r.never),
            ANEndAnnoTextTrack(d, nullptr), ANStartAnnoTextTrack(d, &r.never),
            ANEndAnnoTextTrack(d, &r.never), ANAnnoEvent(d, ANEVENT_MOVE, list[0].slot, nullptr),
            ANAnnoEvent(d, ANEVENT_CLICK1, AN_NONE, nullptr)})),
        // Any cursor and highlight slot stay inside the table; a cursor past every table is none.
        ROW(0, 0, 0, 0, FOR(0, 0xFFFF, (r.track = {}, r.track.cursor = uint16_t(v),
            r.track.hiliteEntry = v < 65530 ? uint16_t(v * 7) : AN_NONE,
            ANTrackAnno(d, &r.at, &r.track) & (v < 65530 ? ~0x3Fu : ~0u)))),
        // A slot naming no entry delivers nothing and leaves the hover alone.
        ROW(0, 0, 0, 0, FOR(0, AN_NONE - 1, listed[v] ? 0 : ANAnnoEvent(d, ANEVENT_MOVE,
            uint16_t(v), &r.at) | ANAnnoEvent(d, ANEVENT_CLICK1, uint16_t(v), &kText))),
        // Null pointers, and text tracks never started or already ended: 15 whatever the document.
        ROW(15, 15, 15, 15, All({FOR(1, 7, ANAddAnno(d, uint16_t(v), nullptr)),
            ANAddAnno(d, AN_TYPE_TEXT, &nullText), ANCopyAnnos(d, nullptr),
            ANStartAnnoTextTrack(d, nullptr), ANFindAnno(d, 0, nullptr),
            ANNextChunkerPos(d, nullptr, &r.to), ANNextAnnoTextPos(d, &r.at, nullptr),
            ANNextChunkerPos(d, &r.at, nullptr), ANNextAnnoTextPos(d, nullptr, &r.to),
            ANGetAnnoText(d, &r.never, &kText, &r.unit), ANGetAnnoText(d, nullptr, &kText, &r.unit),
            ANGetAnnoText(d, &r.live, nullptr, &r.unit), ANGetAnnoText(d, &r.live, &kText, nullptr),
            (ANEndAnnoTextTrack(d, &r.live), ANGetAnnoText(d, &r.live, &kText, &r.unit))})),
        ROW(15, 18, 5, 25, ANGetAnnoText(d, &r.live, &kText, &r.unit)),
        ROW(15, 18, 0, 25, ANFindAnno(d, 0, &r.find)),
    };
    // clang-format on
    auto state = [&] {  // what callers can see of each document: binding, hover, table, texts
        std::vector<uint32_t> s{uint32_t(notes_.calls.size())};
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
    for (const auto &[name, call, want] : rows)
        for (int i = 0; i < 4; ++i) {
            if (want[i] == X) continue;
            SCOPED_TRACE(std::string(name) + " with document " + std::to_string(i));
            const std::vector<uint32_t> before = state();
            Records r;
            EXPECT_EQ(call(docs[i], r), want[i]);
            EXPECT_TRUE(state() == before) << "a document changed or the callback heard something";
        }
}

}  // namespace
