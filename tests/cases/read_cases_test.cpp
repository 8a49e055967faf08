// Exact outcomes of the reading calls in worked examples, and each mend, mostly as rows.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <set>
#include <string>
#include <tuple>
#include <vector>

#include "support/fixture.h"
#include "support/table_view.h"

namespace {
using namespace annotest;  // NOLINT(google-build-using-namespace)
using antk::Fn;
using std::to_string;
using Str = std::string;
constexpr uint32_t kNo = ANPOS_NOSUBITEM, kU = 0xA5A5A5A5;  // kU: a field left alone
class ReadCases : public LeakCheckedTest {};
// Positions in rows: "7" the item, "7.3" its character 3, "7:2" or "7.3:2" annotation text.
ANPos ParsePos(const char *&s) {
    char *e = nullptr;
    const uint32_t item = std::strtoul(s, &e, 10);
    const uint32_t sub = *e == '.' ? std::strtoul(e + 1, &e, 10) : kNo;
    const uint32_t text = *e == ':' ? std::strtoul(e + 1, &e, 10) : kNo;
    s = e;
    return text == kNo ? Pos(item, sub) : TextPos(item, sub, text);
}
Str Show(const ANPos &p) {
    const Str sub = p.subItemId == kNo ? "" : Str(".") + to_string(p.subItemId);
    return to_string(p.itemId) + sub + (p.kind == 5 ? Str(":") + to_string(p.textIndex) : "");
}
Str &Put(Str &s, const Str &x) { return (s += s.empty() ? "" : " ") += x; }  // blank-separated
Str Hex(uint32_t v) { return (v > 15 ? Hex(v >> 4) : Str()) + "0123456789ABCDEF"[v & 15]; }
ANHiliteStyle Style(uint32_t id, uint32_t flags, uint32_t c1, uint32_t c2, uint16_t a1 = 0x10,
                    uint16_t a2 = 0x20, uint32_t size = 28, uint32_t reserved = 0) {
    return ANHiliteStyle{size, id, flags, c1, c2, a1, a2, reserved};
}
// A document with state, by letter: '.' type 0, 'c' cut (field 2 1), 'S' 's' types 240 241, 'p'
// type 1, 'q' field 2 2; texts h "hello" a "abc" d "de" x "xy" l "last" e "" f "f"; '/' ends a
// chunk (ids chunk << 16 | index); "@1 10000 10": item 1's text hidden by span flags 0x10000,
// option 0x10. `prep`: letter, position or "from-to", "#tag", "/arg" (hex): R range, T text "ab",
// M marker, P placeholder, E empty text, H highlight (arg: style), O V points (arg: value), C
// clear.
DAHandle Made(const Str &layout, const Str &prep = "", ANStyleTable *g = nullptr) {
    static const char *const kText[] = {"hello", "abc", "de", "xy", "last", "", "f"};
    const uint32_t type[] = {0, 0, 240, 241, 1, 0}, f2[] = {0, 1, 0, 0, 0, 2};
    uint32_t hide = kNo - 1, flags = 0, option = 0;
    const size_t at = std::min(layout.find('@'), layout.size());
    std::sscanf(layout.c_str() + at, "@%u %x %x", &hide, &flags, &option);
    antk::DocumentBuilder b;
    for (const char c : layout.substr(0, at)) {
        const size_t t = Str("hadxlef").find(c), k = Str(".cSspq").find(c);
        if (c == '/') b.newChunk();
        const uint32_t id = t < 7 ? b.textItem(kText[t]) : k < 6 ? b.item(type[k], f2[k]) : kNo;
        if (id == hide) b.hideItemText(id, flags);
    }
    b.option(option);
    DAHandle doc = b.build();
    EXPECT_EQ(ANInit(doc, g, nullptr, nullptr), AN_OK);
    for (const char *s = prep.c_str(); *s != 0; s += *s == ' ') {
        const char k = *s++;
        const ANPos a = ParsePos(s), z = *s == '-' ? ParsePos(++s) : a;
        uint32_t v[] = {3, 0, 1};  // "#tag", "/arg" (hex), "*times" (a big table: "*300")
        for (char *e = nullptr; *s != 0 && std::strchr("#/*", *s) != nullptr; s = e)
            v[std::strchr("#/*", *s) - "#/*"] = std::strtoul(s + 1, &e, *s == '*' ? 10 : 16);
        const uint32_t tag = v[0], arg = v[1];
        for (uint32_t n = 0; n < v[2]; ++n)
            EXPECT_EQ(k == 'R'               ? AddRange(doc, a, z, tag, arg)
                      : k == 'M' || k == 'P' ? AddMark(doc, k == 'M' ? 7 : 6, a, tag)
                      : k == 'T' || k == 'E' ? AddText(doc, a, k == 'T' ? u"ab" : u"", tag, arg)
                      : k == 'H'             ? AddHilite(doc, a, z, tag, arg)
                      : k == 'C'             ? ANClearAnnos(doc, ANCLEAR_EQUAL, tag)
                                             : AddPoint(doc, a, tag, arg, k == 'O' ? 2 : 4),
                      AN_OK);
    }
    return doc;
}
// "r 1-8" ("r44": 44 bytes) adds a range of tag 5: ranges R, markers M (m: tag 3, there before)
// in list order; " !" unless heard once as given, else on failure " !", the code, "n" if heard.
Str Split(DAHandle doc, const char *q, Fn fn = Fn::Count, uint64_t nth = 0, bool sticky = false) {
    Notifications notes;
    notes.Attach(doc);
    antk::resetCalls();
    if (nth > 0) antk::failCall(fn, nth, 55, sticky);
    const char *at = std::strchr(q, ' ') + 1;
    const ANPos from = ParsePos(at), to = ParsePos(++at);
    const ANRangeDesc d{*q == ' ' ? 48u : static_cast<uint32_t>(std::atoi(q)), 5, from, to, 0};
    const uint32_t rc = ANAddAnno(doc, AN_TYPE_RANGE, &d);
    antk::clearFailures();
    Str s;
    for (const Entry &e : ListEntries(doc)) {
        const ANPos &a = e.record.start, &b = e.record.end;
        const bool one =
            a.kind == 5 ? b.textIndex == a.textIndex + 1 : b == Pos(a.itemId, a.subItemId + 1);
        if (e.type == AN_TYPE_RANGE || e.type == AN_TYPE_CUTMARK)
            Put(s, "MmR"[e.type == 3 ? 2 : e.record.tag == 3] + Show(a) +
                       (e.type == 3 || !one ? Str("-") + Show(b) : ""));
    }
    if (rc != AN_OK) return s + " !" + to_string(rc) + (notes.calls.empty() ? "" : "n");
    const ANAnnoRecord r = notes.calls.empty() ? ANAnnoRecord{} : notes.calls[0].record;
    const bool back = ANCompPos(&to, &from) < 0;
    const bool ok = notes.calls.size() == 1 && notes.calls[0].detail == AN_TYPE_RANGE &&
                    r.value == ~0ull << 32 && r.tag == 5 && r.start == (back ? to : from) &&
                    r.end == (back ? from : to);
    return s + (ok ? "" : " !");
}
// "k 0 9 1 500": a walk over items 0-9, markActive 1 first, then cursor 500: per position bits,
// h the highlight (k the cursor for "j"), values written C color1 D color2 A attr1 B attr2 (lower
// case: flag clear). "K 0 2": starts: state:cursor@nextChange, "/0" flags cleared, markActive.
Str Tracked(DAHandle doc, const char *q, char k) {
    uint32_t from = 0, to = 0, cursor = AN_NONE;
    ANTrackInfo t;
    std::memset(&t, 0x5A, sizeof t);
    Str s;
    t.nextChange = TextPos(kU, kU, 7), t.markActive = k == 'K';
    for (const char *at = q; k == 'K' && *at != 0;) {
        const ANPos p = ParsePos(at);
        Put(s, to_string(ANStartAnnoTrack(doc, &p, &t)) + ":");
        s += (t.cursor == AN_NONE ? "-" : to_string(t.cursor)) + "@" + Show(t.nextChange);
        s += (t.rangeActive | t.color1Set | t.attrSet ? "/x" : "/0") + to_string(t.markActive);
    }
    if (k == 'K') return s;
    std::sscanf(q, "%u %u %u %u", &from, &to, &t.markActive, &cursor);
    ANPos p = Pos(from), next{};
    EXPECT_EQ(ANStartAnnoTrack(doc, &p, &t), ANTRACK_ACTIVE);
    t.cursor = cursor == AN_NONE ? t.cursor : static_cast<uint16_t>(cursor);
    do {
        t.color1 = t.color2 = t.attr1 = t.attr2 = kU;
        Put(s, to_string(ANTrackAnno(doc, &p, &t)));
        if (k == 'j' && t.cursor != AN_NONE) s += Str("k") + to_string(t.cursor);
        if (t.hiliteEntry != AN_NONE) s += Str("h") + to_string(t.hiliteEntry);
        const uint32_t set[] = {t.color1Set, t.color2Set, t.attrSet, t.attrSet};
        const uint32_t v[] = {t.color1, t.color2, t.attr1, t.attr2};
        for (int i = 0; i < 4; ++i)
            s += v[i] == kU ? "" : Str(1, "cdabCDAB"[i + 4 * !!set[i]]) + Hex(v[i]);
    } while (ANNextPos(doc, &p, &next) == AN_OK && (p = next).itemId <= to);
    return s;
}
// "c 1.0", "n 1.0", "t 1.0": the positions the content step, the merged walk or the text step
// visits, then "!" and the code that ended it, "z" when `next` was zeroed, "?" when written.
Str Walk(DAHandle doc, const char *q, char step) {
    ANPos p = ParsePos(q), next{9, 9, 9, 9};
    Str s = Show(p);
    for (uint32_t n = 0, rc = 0; n < 40; ++n, (s += " ") += Show(p = next), next = {9, 9, 9, 9}) {
        rc = step == 'c'   ? ANNextChunkerPos(doc, &p, &next)
             : step == 'n' ? ANNextPos(doc, &p, &next)
                           : ANNextAnnoTextPos(doc, &p, &next);
        const char *mark = next == ANPos{} ? "z" : next == ANPos{9, 9, 9, 9} ? "" : "?";
        if (rc != AN_OK) return s + " !" + to_string(rc) + mark;
    }
    return s;
}
// "m 6 8": ordinals to positions ("9.9": not written), "M" also with the content seeks so far;
// "o 3.6": positions to ordinals; "!" and the code on failure, "?" when the record changed.
// "l 5" maps as "m" after a log of the reads: each one's room, "+" and the bytes moved over since
// the one before (0, ~ where the module scribbled). "l3 5": each read tells lie 3: written room + 1
// (1) or ~0 (2), charCount ~0 (3), 0x7FFFFFFF wide not taken (4), charCount 0 and written 7 (5).
Str Mapped(DAHandle doc, const char *q, char k) {
    Str s, log;
    if (k == 'M') antk::resetCalls();
    const int lie = k == 'l' && *q != ' ' ? *q++ - '0' : 0;
    const unsigned char *last = nullptr;
    if (k == 'l')
        HookContentReads([&](ContentPiece &p) {
            for (log += last && last != p.buffer ? " +" : ""; last && last != p.buffer; ++last)
                log += *last == 0 ? '0' : *last == 0xAA ? '~' : char(*last);
            Put(log, to_string(p.room)), last = p.buffer;
            if (p.written < p.room) std::memset(p.buffer + p.written, 0xAA, p.room - p.written);
            p.written = lie == 1 ? p.room + 1 : lie == 2 ? ~0u : lie == 5 ? 7 : p.written;
            p.charCount = lie == 3 ? ~0u : lie == 4 ? 0x7FFFFFFF : lie == 5 ? 0 : p.charCount;
            if (lie == 4) p.flags |= 0x10000, p.charSet = antk::kCharSetWide;
        });
    for (const char *at = q; *at != 0;) {
        const ANPos p = ParsePos(at);
        ANMapRecord m{28, k == 'o' ? 2u : 1u, k == 'o' ? p : Pos(9, 9), k == 'o' ? 999 : p.itemId};
        const ANMapRecord before = m;
        const uint32_t rc = ANMapPosition(doc, &m);
        const Str got = k == 'o' ? to_string(m.ordinal) : Show(m.pos), bad = '!' + to_string(rc);
        Put(s, rc == AN_OK ? got : bad + (std::memcmp(&m, &before, 28) ? "?" : ""));
        if (k == 'M') s += Str("/") + to_string(antk::calls(Fn::CASeek));
    }
    HookContentReads({});
    return k == 'l' ? log + " = " + s : s;
}
// Rows: layout|annotations first|query|expected|a call failing ("CHGetItem 1", "s": for good).
// Layout "" is no document. Global styles: 11 (in 24 bytes), 20-24 (flags 0 1 2 4 ~7).
TEST_F(ReadCases, Rows) {
    ANStyleTable *global = nullptr;
    ASSERT_EQ(ANInitGlobalHiliteStyles(&global), AN_OK);
    for (const ANHiliteStyle &s :
         {Style(11, 4, 0, 0, 0xFFFE, 0, 24), Style(20, 0, 0xABC, 0xDEF, 5, 6),
          Style(21, 1, 0xABC, 0xDEF, 5, 6), Style(22, 2, 0xABC, 0xDEF, 5, 6),
          Style(23, 4, 0xABC, 0xDEF, 5, 6), Style(24, ~7u, 0xABC, 0xDEF, 5, 6)})
        ASSERT_EQ(ANAddGlobalHiliteStyle(global, &s), AN_OK);
    const Str ten = "..........|", st = "...|H1-3/", map = "phpx/apd/lp||", ix = ten + "O9*300 ";
    const auto S = [&](const char *w, const char *e) { return st + w + "|k 1 1|2h0" + e; };
    // clang-format off
    const Str rows[] = {
        // ---- Range splitting: trimming, pieces, markers at cuts; one notification per range.
        "...Sc..c..||r 1-8|R1-3 M4 R5-7 M7", "...Sc..c..||r 8-1|R1-3 M4 R5-7 M7",
        ".hch.|R1.1-3.8|r 1.0-1.0|R1.0-2 m2 R3.5-3.8", "....c..c..|M4|r 1-9|R1-4 m4 R5-7 M7 R8-9",
        ten + "T4 P4:1|r 1-8|R1-4:1 M4:1 R4:2-8", "....c...c.|R5-6|r 1-9|R1-4 M4 R5-8 M8",
        "...Sc..c..||r44 3-9|M4 R5-7 M7 R8-9", ".hch.||r 1.1-3.8|R1.1-2 M2 R3.5-3.8",
        "....cc....|M4|r 1-8|R1-4 m4 M5 R6-8", "....c.....|M5|r 1-8|R1-4 M4 m5 R6-8",
        "......c...|R2-4|r 0-9|R0-6 M6 R7-9", "......c...|R1-4|r 2-8|R1-6 M6 R7-8",
        "....c..c..|R0-1|r 2-9|R0-1 R2-4 M4 R5-7 M7 R8-9", "....cSc...||r 1-9|R1-4 M4 R5-6 M6 R7-9",
        "...Sc..c..||r 3-9|M4 R5-7 M7 R8-9", "....S.....|M5 M6|r 1-6|R1-4 m5 m6",
        "...cc....||r 1-7|R1-3 M3 M4 R5-7", ten + "P4|r 1-8|R1-4:0 M4:0 R4-8",
        "....cS....||r 1-8|R1-4 M4 R6-8", "..SSc....||r 0-7|R0-2 M4 R5-7", ten + "M3|r 3-5|m3 R4-5",
        "..pq.Sc..||r 1-8|R1-5 M6 R7-8", ten + "M5 M6|r 2-7|R2-7 m5 m6", "....c....||r 4-7|M4 R5-7",
        ten + "M3 R3-5|r 4-7|m3 R4-7", ten + "M6|r 6.0-8|m6 R6.0-8", ten + "R2-7|r 3-5|R2-7 R4-5",
        ix + "M3 R3-5|r 4-7|m3 R4-7", ix + "R2-7|r 3-5|R2-7 R4-5", ix + "|r 1-3|R1-3",
        "...S......|T3|r 3:0-6|R4-6", ten + "R3-6 P4|r 1-8|R1-8", "....SS....||r 1-5|R1-4",
        "..SsS.....||r 2-4|R3-4", "....c....||r 2-2|R2-3", "....c....||r 4-4|R4-5",
        "..Ss.....||r 2-6|R4-6", ten + "H1-4|r 2-5|R2-5", ten + "R0-2|r 2-4|R0-4",
        ten + "P2|r 2-5|R2-5",
        // Past the document's end a range ends one step past its last position; so does one there.
        "......||r 2-50|R2-5.0", "......||r 2-5|R2-5",
        "......||r 40-50|R40-40.0", "......||r 60-60|R60-60.0", "......||r 5-5|R5-5.0",
        "..c..c..c..c..c..c..c..c..c..c..c..c..c..c..c..c||r 0-47|R0-2 M2 R3-5 M5 R6-8 M8 R9-11 "
            "M11 R12-14 M14 R15-17 M17 R18-20 M20 R21-23 M23 R24-26 M26 R27-29 M29 R30-32 M32 "
            "R33-35 M35 R36-38 M38 R39-41 M41 R42-44 M44 R45-47",  // the table grows meanwhile
        // A failed step ends its walk (chunker failures are absorbed), the tail's at the end too.
        "...Sc..c..||r 1-8|R1-1.0|CHNextItemId 1s", "...Sc..c..||r 1-8|R1-1.0|CHGetItem 1s",
        "..S.......||r 2-2|R2-3|CHGetItem 1", "....cSS||r 1-6|R1-4 M4",
        // ---- Tracking: a start past all keeps nextChange's kind, index; none clears range/flags.
        ten + "O8 H3-4 R1-3|K 9 0 2 3 7|1:-@4294967295:7/01 2:2@1/01 2:2@2/01 2:2@3/01 2:0@8/01",
        ten + "|K 5|0:23130@2779096485.2779096485:7/01",
        // A stale cursor beyond the table counts as none: found from the head, nothing examined.
        ten + "O8 H3-4 R1-3|j 0 2 0 500|0k500 0k2 0k2",
        // Ending here: not reported, may be the cursor; ranges show at start, past end; mark kept.
        ten + "O8/22 H3-6/9 R1-3|k 0 9|0 1 0 3h1C0DFF 0h1 0h1 2 0 4 0",
        ten + "O1 V3 P5 T7 M7|k 0 9 1|0 20 0 8 0 0 0 0 0 0 48 16 0",
        ten + "H1-3/a0 O2/5 R2-3|j 2 4|7k0h0CFF00D0 3k2 0",
        // Highlights: nested wins, else the higher slot, equal ones the first; flags cleared.
        ten + "H1-4/a0 H2-3/100000c0|k 1 4|2h0CFF00D0 2h1CFF0000d0 2h0CFF00D0 2",
        ten + "H1-4/a0 H2-3/c0|k 1 5|2h0CFF00D0 2h1CFF0000D0 2h0CFF00D0 2 0",
        ten + "H2-3/c0 H1-4/a0|k 1 5|2h1CFF00D0 2h0CFF0000D0 2h1CFF00D0 2 0",
        ten + "H1-3/a0 H2-4/c0|k 1 4|2h0CFF00D0 2h1CFF0000D0 2h1CFF0000D0 2",
        ten + "H2-4/c0 H1-3/a0|k 1 4|2h1CFF00D0 2h1CFF00D0 2h0CFF0000D0 2",
        ten + "H5-6#7 H1-3/a0 C0#7 H1-3/c0|k 1 3|2h1CFF00D0 0h1 2",
        // ---- Style words on [1, 3): palette, off and ignored bits; values written whatever flags.
        S("4000000b", "c0d0AFFFEBFFFF"), S("8fffff5a", "C800080DFF00"), S("78", "CC0C0C0D808080"),
        S("40000014", "cABCdDEFa5b6"), S("40000015", "CABCdDEFa5b6"), S("40000016", "cABCDDEFa5b6"),
        S("40000017", "cABCdDEFA5B6"), S("40000018", "cABCdDEFa5b6"), S("1000004c", "C800000"),
        S("2000004c", "DFF0000"), S("f", "C0DFFFFFF"), S("300000ff", ""), S("40000008", ""),
        // ---- Stepping (c content, n merged, t text); from annotation text c goes to the anchor.
        "||c 12.7:3|12.7:3 12.7 !15z", "pxa||c 2|2 2.3 2.4 !25z",
        // The content step cannot cycle: empty text items, foreign characters, failed steps.
        "pad/p|E2.4|n 2.3|2.3 2.4:0 2.4 65536 !25", "dap||c 1.0|1.0 1.2 1.3 1.4 2 !25z",
        "dap||c 0.3|0.3 1.2 1.3 1.4 2 !25z", "ap||c 0.0|0.0 !25z|CHNextItemId 1",
        "ap||n 0.0|0.0 !25|CHNextItemId 1s", "px||c 0|0 1 1.1 !25z|CHGetItem 2",
        "pex||c 1.0|1.0 2.0 2.1 !25z", "pex||n 0|0 1 2.0 2.1 !25",
        // The text step takes the first text after P; text at character 0 never sends a walk back.
        "pad/p|T1 T1.0 T1.1 T2 T2.0|n 0|0 1:0 1:1 1 1.1:0 1.1:1 1.1 1.2 2:0 2:1 2 2.4 65536 !25",
        "pad/p|T65536 P65536 T65536 T1.1|t 1.2|1.2 65536:0 65536:1 65536:2 65536:3 65536:4 !25",
        "pad/p|T1.0 T2.0|n 0|0 1.0:0 1.0:1 1.0 1.1 1.2 2.0:0 2.0:1 2.0 2.3 2.4 65536 !25",
        "pad/p|T1 T2|t 1.1|1.1 2:0 2:1 !25", "pad/p|O3*300 T1 T2 T2.0|t 1.1|1.1 2:0 2:1 !25",
        "pad/p|O4*260 T65536 P65536 T65536 T1.1|t 1.2|1.2 65536:0 65536:1 65536:2 65536:3 "
        "65536:4 !25",
        // ---- Mapping over three chunks, hidden and wide text counted; two maps cached at most.
        map + "m 0 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16|1.0 1.1 1.2 1.3 1.4 3.5 3.6 "
            "65536.65536 65536.65537 65536.65538 65538.65539 65538.65540 131072.131072 "
            "131072.131073 131072.131074 131072.131075 !25",
        map + "o 1.1 3.6 65538.65540 131072.131075 1 3 0 2 65537 131073 3.1 65538.131073 "
            "65536.65538 327680|1 6 11 15 0 5 0 5 10 16 5 10 9 !25",
        map + "M 0 8 1 9 6 7 13 10 2|1.0/1 65536.65537/2 1.1/2 65536.65538/2 3.6/2 65536.65536/2 "
            "131072.131073/3 65538.65539/3 1.2/4",
        "adf@1 120000 0||m 5 3 2|2.5 1.3 0.2", "adf@1 10000 10||m 5 3 2|2.5 1.3 0.2",
        "adf@1 10000 0||m 5 3 2|2.5 1.3 0.2", "a/p/f||o 65536|3",
        // Chunker-failed maps are made again; unopenable content not retried; failed reads keep.
        map + "m 8 10 7|65536.65537 !25 65536.65536|CAReadNext 3", map + "o 3.6|0|CHGetItemId 1",
        map + "m 6 6 8|!25 3.6 65536.65537|CHGetItemCountById 1", map + "m 13|9.9|CAReadNext 1",
        map + "m 6 6 8|9.9 9.9 65536.65537|CHGetSectionInfo 1", map + "o 3.6|!15|DAOpenDocument 1",
        map + "m 6 6 8|!25 3.6 65536.65537|CHGetItemId 1", map + "o 131072.131073|12|CAReadNext 1",
        map + "m 6 6 8|!18 !25 9.9|DAOpenDocument 1", map + "m 6 6 8|!18 !25 9.9|CAOpenContent 1",
        map + "o 3.6|!15|CHGetItemCountById 1", map + "o 3.6|!25|CHGetRunFromItemId 1",
        // Reading: lock 3 is the cached map's; hidden text is moved over as 0s, wide text by 2s.
        map + (ANNO_HAVE_PLATFORM_CONTROLS ? "o 3.6|!15|GlobalLock 3" : "o 3.6|6"),
        "adf@1 10000 0||l 5|12 +abc 9 9 +00 7 7 +f 6 = 2.5", "ad||l1 2 3|10 = 0.2 !25",
        "adf@1 0 10||l 5|12 +a0b0c0 6 +0000 2 +f0 0 = 2.5", "ad||l2 2 3|10 = 0.2 !25",
        "ad||l3 4 5|10 +abc 7 +de 5 = 0.4 !25", "ad||l4 4 5|10 = 0.4 !25",
        "ad||l5 0|10 +abc~~~~ 3 +de~ 0 = 9.9", "adf@1 120000 0||l 5|12 +abc 9 9 +00 7 7 +f 6 = 2.5",
    };
    // clang-format on
    for (const Str &row : rows) {
        std::vector<Str> f(1);
        for (const char c : row) c == '|' ? (void)f.emplace_back() : f.back().push_back(c);
        f.resize(5);
        SCOPED_TRACE(row);
        Doc doc(f[0].empty() ? nullptr : Made(f[0], f[1], global));
#if ANNO_HAVE_PLATFORM_CONTROLS
        if (f[4].rfind("GlobalLock", 0) == 0) anwin::failGlobalLock(std::atoi(&f[4][10]));
#endif
        for (int fn = 0; !f[4].empty() && fn < static_cast<int>(Fn::Count); ++fn)
            if (f[4].rfind(antk::fnName(Fn(fn)) + Str(" "), 0) == 0)
                antk::failCall(Fn(fn), std::atoi(&f[4][f[4].find(' ')]), 55, f[4].back() == 's');
        const char k = f[2][0], *q = f[2].c_str() + 1;
        const Str got = k == 'r'                                       ? Split(doc, q)
                        : k == 'k' || k == 'K' || k == 'j'             ? Tracked(doc, q, k)
                        : k == 'm' || k == 'o' || k == 'M' || k == 'l' ? Mapped(doc, q, k)
                                                                       : Walk(doc, q, k);
        antk::clearFailures();
#if ANNO_HAVE_PLATFORM_CONTROLS
        EXPECT_EQ(anwin::globalLocks(), 0);  // nothing is left locked between calls
#endif
        EXPECT_EQ(got, f[3]);
    }
    ANDeInitGlobalHiliteStyles(global);
}
// The worked example: slots in list order, the block owned by pieces only; DAGetAnno failing is
// returned unannounced, what came before kept; a chunker failure ends a walk, the range is added.
TEST_F(ReadCases, RangeRecordsAndFailures) {
    Doc doc(Made("...Sc..c.."));
    const uint64_t block = NewHeapBlock(32);
    ASSERT_EQ(AddRange(doc, Pos(1), Pos(8), 0x51, block), AN_OK);
    const auto list = ListEntries(doc);
    for (uint16_t i = 0; i < list.size() || i < 4; ++i) {
        const ANAnnoRecord &r = list.at(i).record;
        EXPECT_EQ(std::tie(list[i].slot, r.size, r.tag, r.userData, r.value, r.eventMask,
                           list[i].ownsUserData),
                  std::make_tuple(i, 64u, 0x51u, block, uint64_t{0}, 0u, i % 2 == 0));
    }
    EXPECT_EQ(ANClearUserData(doc), AN_OK);
    for (const Entry &e : ListEntries(doc)) EXPECT_EQ(e.record.userData, 0u);
    for (const Fn fn : {Fn::DAGetAnno, Fn::CHGetItem, Fn::CHNextItemId}) {
        std::set<Str> kept;  // n / 2: the call failing (none at first), once (n even) or for good
        for (uint64_t n = 0, count = 1; n < 2 * count + 2; ++n) {
            Doc failing(Made("...Sc..c.."));
            const Str got = Split(failing, " 1-8", fn, n / 2, n % 2 == 1);
            count = n == 0 ? antk::calls(fn) : count;
            const size_t c = got.find(" !");
            EXPECT_TRUE(c == Str::npos || (fn == Fn::DAGetAnno && got.substr(c) == " !55")) << got;
            for (const Entry &e : ListEntries(failing))
                EXPECT_TRUE(e.record.start.itemId >= 1 && e.record.end.itemId <= 8) << got;
            if (c != Str::npos && n % 2 == 0) kept.insert(got.substr(0, c));
        }
        EXPECT_EQ(kept, (fn == Fn::DAGetAnno ? std::set<Str>{"", "R1-3", "R1-3 M4", "R1-3 M4 R5-7"}
                                             : std::set<Str>{}));
    }
}
// A content module that never ends is cut off where its chunk must end: 25, and read anew later.
TEST_F(ReadCases, AContentModuleThatNeverEndsIsCutOff) {
    Doc doc(Made("ad"));
    HookContentReads([](ContentPiece &p) { p.type = p.type == 5 ? 4 : p.type; });
    ANMapRecord m{28, ANMAP_ORDINAL_TO_POS, Pos(9, 9), 1};
    EXPECT_EQ(ANMapPosition(doc, &m), AN_ERR_NOTFOUND);
    HookContentReads({});
    EXPECT_TRUE(ANMapPosition(doc, &m) == AN_OK && m.pos == Pos(0, 1));
}
// Events naming no listed slot (3 free, 10 and 500 beyond) do nothing, answer 0, keep the hover.
TEST_F(ReadCases, EventsFromNoSlot) {
    Doc doc(Made("..........", "H2-6#1 H4-8#2 O5"));
    Notifications heard{{}, 7};  // each enter answers 7, the last one shows
    heard.Attach(doc);
    ANPos five = Pos(5), nine = Pos(9), hover{};
    EXPECT_EQ(ANAnnoEvent(doc, ANEVENT_MOVE, 0, &five), 7u);
    for (const uint16_t entry : {3, 10, 500}) {
        EXPECT_EQ(ANAnnoEvent(doc, ANEVENT_MOVE, entry, &nine), 0u);
        EXPECT_EQ(ANAnnoEvent(doc, ANEVENT_CLICK1, entry, &five), 0u);
    }
    EXPECT_EQ(heard.calls.size(), 3u);  // the three entered at 5
    EXPECT_TRUE(HoverEntry(doc, &hover) == 0 && hover == five);
}
// Lookups by id: the result, then flags color1 color2 attr1 attr2 reserved in hex.
Str Got(DAHandle doc, ANStyleTable *g, std::initializer_list<uint32_t> ids) {
    Str out;
    for (const uint32_t id : ids) {
        ANHiliteStyle s = Style(id, 1, 2, 3);  // 25 (not found): left alone
        const uint32_t rc = doc ? ANGetHiliteStyle(doc, id, &s) : ANGetGlobalHiliteStyle(g, id, &s);
        Put(out, to_string(rc) + ":" + Hex(s.flags));
        for (const uint32_t v : {s.color1, s.color2, s.attr1 + 0u, s.attr2 + 0u, s.reserved})
            Put(out, Hex(v));
    }
    return out;
}
// Style tables keep all 28 bytes (24-byte forms: attr2 0xFFFF, reserved 0); a failed lookup or
// add leaves things alone; a document's own style shadows the global one, replaced by id.
TEST_F(ReadCases, StyleTablesKeepWhatTheyAreGiven) {
    ANStyleTable *g = nullptr;
    ASSERT_EQ(ANInitGlobalHiliteStyles(&g), AN_OK);
    const ANHiliteStyle a = Style(3, 7, 0x112233, 0x445566, 0x1111, 0x2222, 28, 0xDEADBEEF);
    const ANHiliteStyle replaced = Style(3, 2, 0xCCCCCC, 0, 0, 1), nine = Style(9, 1, 0x99, 0);
    const ANHiliteStyle old = Style(3, 5, 0x0A0B0C, 0x0D0E0F, 0x3344, 0, 24, 0x77777777);
    const auto add = [&](ANHiliteStyle s) { return ANAddGlobalHiliteStyle(g, &s); };
    // At the 16-bit limit (65529 styles) a new id is refused with 13, a present one replaced.
    for (uint32_t id = 99; id < 65630; ++id)
        ASSERT_EQ(add(id == 99 ? a : Style(id, 1, id, 0)), id < 65628 ? AN_OK : AN_ERR_NOMEM) << id;
    ASSERT_EQ(add(old), AN_OK);
    for (uint32_t size : {0u, 20u, 23u, 25u, 27u, 29u, 32u})
        EXPECT_EQ(add(Style(3 + size % 2 * 74, 0, 9, 0, 0, 0, size)), 15u);
    EXPECT_EQ(Got(nullptr, g, {3, 77, 65628, 100, 65627}),
              "0:5 A0B0C D0E0F 3344 FFFF 0 25:1 2 3 10 20 0 25:1 2 3 10 20 0 0:1 64 0 10 20 0 "
              "0:1 1005B 0 10 20 0");
    Doc doc(PlainDocument(1));
    ASSERT_EQ(ANInit(doc, g, nullptr, nullptr), AN_OK);
    EXPECT_EQ(Got(doc, g, {3}), "1:5 A0B0C D0E0F 3344 FFFF 0");
    for (const ANHiliteStyle *s : {&old, &a}) ASSERT_EQ(ANAddHiliteStyle(doc, s), AN_OK);  // by id
    EXPECT_EQ(Got(doc, g, {3, 100, 4}) + " " + Got(nullptr, g, {3}),
              "1:7 112233 445566 1111 2222 DEADBEEF 1:1 64 0 10 20 0 0:1 2 3 10 20 0 "
              "0:5 A0B0C D0E0F 3344 FFFF 0");
    // A copy brings the source's styles by id; onto itself (one table) it changes nothing.
    Doc src(Made("...", "H0-1"));
    ASSERT_EQ(ANAddHiliteStyle(src, &replaced) + ANAddHiliteStyle(src, &nine), AN_OK);
    ASSERT_EQ(ANCopyAnnos(doc, src), AN_OK);
    const std::vector<uint8_t> before = TableBytes(doc);
    EXPECT_EQ(ANCopyAnnos(doc, doc), AN_OK);
    EXPECT_EQ(TableBytes(doc), before);
    EXPECT_EQ(Got(doc, 0, {3, 9}), "1:2 CCCCCC 0 0 1 0 1:1 99 0 10 20 0");
    ANDeInit(doc);
    ANDeInitGlobalHiliteStyles(g);
}
// Text reads: a placeholder reads 6; the cache answers without the document, only for its own
// anchor ((1, -) and (1, 0) sort alike); a track never started or already ended is refused.
TEST_F(ReadCases, AnnotationTextReads) {
    Doc doc(Made("pap", "E0 T1 P1.0 T2 P2 T2"));
    ANAnnoTextTrack t{};
    const auto read = [&](const char *q) {  // the result (and unit read) per position
        Str s;
        for (const char *at = q; *at != 0; at += *at == ' ') {
            uint16_t unit = 0xEEEE;
            const ANPos p = ParsePos(at);
            Put(s, to_string(ANGetAnnoText(doc, &t, &p, &unit)));
            if (unit != 0xEEEE) s += Str("=") + char(unit != 0 ? unit : '0');
        }
        return s;
    };
    EXPECT_EQ(read("0:0"), "15");
    ASSERT_EQ(ANStartAnnoTextTrack(nullptr, &t), AN_OK);
    EXPECT_EQ(read("2:0 2:1 2:2 2:3 2:4 2:5 2"), "5=a 5=b 6=0 5=a 5=b 25 25");
    EXPECT_EQ(Show(t.firstPos) + " " + Show(t.lastPos), "2:0 2:4");
    antk::resetCalls();
    EXPECT_EQ(read("2:3"), "5=a");
    EXPECT_EQ(antk::calls(Fn::DAGetAnno), 0u);
    EXPECT_EQ(read("1:1 1.0:0 1:0 0:7"), "5=b 6=0 5=a 25");
    ASSERT_EQ(ANEndAnnoTextTrack(doc, &t), AN_OK);
    EXPECT_TRUE(t.segs == nullptr && t.firstPos == ANPos{} && t.lastPos == ANPos{});
    EXPECT_EQ(read("2:0"), "15");
}
// Items before their characters, text before its anchor, (7, 0) and (7, -) one anchor, fields
// unsigned. A map record with both flags maps the ordinal, keeping the position's kind and index.
TEST_F(ReadCases, PositionOrderAndMapRecords) {
    for (const char *row :
         {"7<7.0", "7.0<7.1", "7<7.4294967294", "1.0<2147483648.0", "7.3:9<7.3", "7.3:1<7.3:2",
          "7.0:2<7", "7:900<7", "7.5<7.6:0", "6.4294967294<7:0", "7.3:2=7.3:2", "7:2=7.0:2"}) {
        const char *s = row, *t = nullptr;
        const ANPos a = ParsePos(s), b = ParsePos(t = s + 1);
        EXPECT_TRUE(ANCompPos(&a, &b) == -(*s == '<') && ANCompPos(&b, &a) == (*s == '<')) << row;
    }
    Doc doc(Made("phpx/apd/lp"));
    ANMapRecord m{28, 3, Pos(1, 2, 5, 9), 8};
    EXPECT_EQ(ANMapPosition(doc, &m), AN_OK);
    EXPECT_EQ(std::tie(m.pos, m.ordinal), std::make_tuple(TextPos(65536, 65537, 9), 8u));
}
}  // namespace
