// Exact outcomes of the reading calls in worked examples, as rows: the fuzz layer holds them
// against brute-force readings at random; these pin named behaviours, exact records and mends.
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
ANPos P(const char *s) { return ParsePos(s); }
Str Show(const ANPos &p) {
    const Str sub = p.subItemId == kNo ? "" : Str(".") + to_string(p.subItemId);
    return to_string(p.itemId) + sub + (p.kind == 5 ? Str(":") + to_string(p.textIndex) : "");
}
// Joins with blanks, in the order written (a braced list is evaluated left to right).
Str Join(std::initializer_list<Str> parts) {
    Str s;
    for (const Str &part : parts) s += (s.empty() ? "" : " ") + part;
    return s;
}
Str Hex(uint32_t v) { return (v > 15 ? Hex(v >> 4) : Str()) + "0123456789ABCDEF"[v & 15]; }
ANHiliteStyle Style(uint32_t id, uint32_t flags, uint32_t c1, uint32_t c2, uint16_t a1 = 0x10,
                    uint16_t a2 = 0x20, uint32_t size = 28, uint32_t reserved = 0) {
    return ANHiliteStyle{size, id, flags, c1, c2, a1, a2, reserved};
}
// A document with state, an item per letter: '.' type 0, 'c' a cut (type 0, field 2 1), 'S' 's'
// types 240 241, 'p' type 1, 'q' type 0 field 2 2; texts h "hello" a "abc" d "de" x "xy" l "last"
// e "" f "f"; '/' ends a chunk (ids chunk << 16 | index); "@1 10000 10": item 1's text hidden by
// span flags 0x10000 (0: as a piece), option 0x10. Then `prep`: letter, position or "from-to",
// "#tag", "/arg" (hex): R range, T text "ab" (arg userData), M marker, P placeholder, E empty
// text, H highlight (arg style), O V points (arg value), W highlight and Q point wanting events
// arg (userData 16 times the tag), C clear of the tag, Y the document's own style 7.
DAHandle Made(const Str &layout, const Str &prep = "", ANStyleTable *g = nullptr) {
    static const char *const kText[] = {"hello", "abc", "de", "xy", "last", "", "f"};
    static const ANHiliteStyle own = Style(7, 7, 3, 4, 3, 4);
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
    EXPECT_TRUE(layout[0] == '!' || ANInit(doc, g, nullptr, nullptr) == AN_OK);  // "!": no state
    for (const char *s = prep.c_str(); *s != 0; s += *s == ' ') {
        const char k = *s++;
        const ANPos a = ParsePos(s), z = *s == '-' ? ParsePos(++s) : a;
        uint32_t tag = 3, arg = 0;
        for (char *e = nullptr; *s == '#' || *s == '/'; s = e) {
            (*s == '#' ? tag : arg) = static_cast<uint32_t>(std::strtoul(s + 1, &e, 16));
        }
        const bool h = k == 'H';
        EXPECT_EQ(k == 'R'               ? AddRange(doc, a, z, tag, arg)
                  : k == 'M' || k == 'P' ? AddMark(doc, k == 'M' ? 7 : 6, a, tag)
                  : k == 'T' || k == 'E' ? AddText(doc, a, k == 'T' ? u"ab" : u"", tag, arg)
                  : h || k == 'W' ? AddHilite(doc, a, z, tag, h * arg, !h * tag * 16, !h * arg)
                  : k == 'C'      ? ANClearAnnos(doc, ANCLEAR_EQUAL, tag)
                  : k == 'Q'      ? AddPoint(doc, a, tag, 0, 2, arg, tag * 16)
                  : k == 'Y'      ? ANAddHiliteStyle(doc, &own)
                                  : AddPoint(doc, a, tag, arg, k == 'O' ? 2 : 4),
                  AN_OK)
            << prep;
    }
    return doc;
}

// "r 1-8" ("r44 3-9": 44-byte descriptor) adds a range of tag 5, the nth call of `fn` failing:
// ranges (R) and markers (M, m of tag 3: there before) in list order; "!" unless heard once, as
// given, with value ~0 << 32; on failure "!" and the code ("n": announced all the same).
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
        const bool oneStep = a.kind == ANPOS_ANNOTEXT ? b.textIndex == a.textIndex + 1
                                                      : b == Pos(a.itemId, a.subItemId + 1);
        if (e.type != AN_TYPE_RANGE && e.type != AN_TYPE_CUTMARK) continue;
        s += Str(s.empty() ? "" : " ") + "MmR"[e.type == 3 ? 2 : e.record.tag == 3] + Show(a);
        s += e.type == 3 || !oneStep ? Str("-") + Show(b) : "";
    }
    const ANAnnoRecord *r = notes.calls.size() == 1 ? &notes.calls[0].record : nullptr;
    const bool back = ANCompPos(&to, &from) < 0,
               heard = r && r->value == ~0ull << 32 && r->tag == 5;
    const bool ok = heard && r->start == (back ? to : from) && r->end == (back ? from : to);
    if (rc != AN_OK) return s + " !" + to_string(rc) + (notes.calls.empty() ? "" : "n");
    return s + (ok && notes.calls[0].detail == AN_TYPE_RANGE ? "" : " !");
}
// "k 0 9 1 500": a walk (ANNextPos) from item 0 to 9, markActive 1 first, then the cursor set
// to 500; per position the bits, h the highlight (and k the cursor for "j"), what was written:
// C color1, D color2, A attr1, B attr2 (lower case: not set). "K 0 2": starts, with the state,
// cursor, nextChange, then "/0" when rangeActive and the style flags were cleared, markActive.
Str Tracked(DAHandle doc, const char *q, char k) {
    uint32_t from = 0, to = 0, cursor = AN_NONE;
    ANTrackInfo t;
    std::memset(&t, 0x5A, sizeof t);
    Str s;
    t.nextChange = TextPos(kU, kU, 7), t.markActive = k == 'K';
    for (const char *at = q; k == 'K' && *at != 0;) {
        const ANPos p = ParsePos(at);
        s += Str(s.empty() ? "" : " ") + to_string(ANStartAnnoTrack(doc, &p, &t));
        const Str cursor = t.cursor == AN_NONE ? "-" : to_string(t.cursor);
        s += ":" + cursor + "@" + Show(t.nextChange) +
             (t.rangeActive | t.color1Set | t.attrSet ? "/x" : "/0") + to_string(t.markActive);
    }
    if (k == 'K') return s;
    std::sscanf(q, "%u %u %u %u", &from, &to, &t.markActive, &cursor);
    ANPos p = Pos(from), next{};
    EXPECT_EQ(ANStartAnnoTrack(doc, &p, &t), ANTRACK_ACTIVE);
    t.cursor = cursor == AN_NONE ? t.cursor : static_cast<uint16_t>(cursor);
    do {
        t.color1 = t.color2 = t.attr1 = t.attr2 = kU;
        s += Str(s.empty() ? "" : " ") + to_string(ANTrackAnno(doc, &p, &t));
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
    ANPos p = P(q), next{};
    Str s = Show(p);
    for (uint32_t n = 0, rc = 0; n < 40; ++n, (s += " ") += Show(p = next)) {
        next = ANPos{9, 9, 9, 9};
        rc = step == 'c'   ? ANNextChunkerPos(doc, &p, &next)
             : step == 'n' ? ANNextPos(doc, &p, &next)
                           : ANNextAnnoTextPos(doc, &p, &next);
        const char *mark = next == ANPos{} ? "z" : next == ANPos{9, 9, 9, 9} ? "" : "?";
        if (rc != AN_OK) return s + " !" + to_string(rc) + mark;
    }
    return s;
}
// "f 4M 11 0 ^3": kind 4, mask test (E equality, - none), tag 0x11, key 0, the last end after
// "^" with ANFIND_AFTER_PREVIOUS ("_": without): the found tag@start-end or "!" and the code.
Str Found(DAHandle doc, const char *q) {
    unsigned kind = 0, tag = 0;
    char test[3] = "", key[16] = "", prev[16] = "_1";
    std::sscanf(q, "%u%2[ME-] %x %15s %15s", &kind, test, &tag, key, prev);
    const auto mode = static_cast<uint16_t>(kind | (std::strchr(test, 'M') ? ANFIND_MASK : 0) |
                                            (std::strchr(test, 'E') ? ANFIND_EQUAL : 0));
    ANFindRecord f{72, mode, 0, tag, P(key), 0xDEAD, {}, P(prev + 1), 0};
    const uint32_t rc = ANFindAnno(doc, prev[0] == '^' ? ANFIND_AFTER_PREVIOUS : 0, &f);
    return rc != AN_OK ? Str("!") + to_string(rc)
                       : Hex(f.foundTag) + "@" + Show(f.foundStart) + "-" + Show(f.foundEnd);
}
// "m 6 8": ordinals to positions ("9.9": not written), "M" also with the content seeks so far;
// "o 3.6": positions to ordinals; "!" and the code on failure, "?" when the record changed.
Str Mapped(DAHandle doc, const char *q, char k, uint32_t size = 28) {
    Str s;
    if (k == 'M') antk::resetCalls();
    for (const char *at = q; *at != 0;) {
        const ANPos p = ParsePos(at);
        ANMapRecord m{size, k == 'o' ? 2u : 1u, k == 'o' ? p : Pos(9, 9),
                      k == 'o' ? 999 : p.itemId};
        const ANMapRecord before = m;
        const uint32_t rc = ANMapPosition(doc, &m);
        const Str got = k == 'o' ? to_string(m.ordinal) : Show(m.pos);
        s += Str(s.empty() ? "" : " ") + (rc == AN_OK ? got : Str("!") + to_string(rc));
        s += rc != AN_OK && std::memcmp(&m, &before, 28) != 0 ? "?" : "";
        if (k == 'M') s += Str("/") + to_string(antk::calls(Fn::CASeek));
    }
    return s;
}
// "e 2,0,5 10,1,7": events (hex) from a slot at a position: deliveries (event, tag letter, "+"
// when wanted), "=" the result (answers are 10 times the tag, 0 for B: the last one shows), the
// hover entry "@" its position; divided by ";".
uint32_t Heard(uint16_t code, uint16_t wanted, void *record, void *out) {
    const auto *e = static_cast<const ANEventRec *>(record);
    const bool ok = code == ANNOTIFY_EVENT && e->size == 24 && e->userData == e->tag * 16;
    *static_cast<Str *>(out) +=
        (ok ? to_string(e->event) : "?") + char('@' + e->tag) + (wanted ? "+ " : " ");
    return e->tag == 2 ? 0 : e->tag * 10;
}
Str Events(DAHandle doc, const char *q) {
    Str s, heard;
    EXPECT_EQ(ANSetCallback(doc, Heard, &heard), AN_OK);
    for (const char *at = q; *at != 0; at += *at == ' ') {
        unsigned event = 0, entry = 0;
        int used = 0;
        std::sscanf(at, " %x,%u,%n", &event, &entry, &used);
        const ANPos p = ParsePos(at += used);
        heard.clear();
        const uint32_t rc = ANAnnoEvent(doc, event, static_cast<uint16_t>(entry), &p);
        ANPos hover{};
        const uint16_t h = HoverEntry(doc, &hover);
        s += Str(s.empty() ? "" : "; ") + heard + "=" + to_string(rc) + " ";
        s += (h == AN_NONE ? "-" : to_string(h)) + "@" + Show(hover);
    }
    return s;
}

// Rows: layout|annotations first|query|expected|a call failing ("CHGetItem 1", "s": for good).
// Layout "" is no document. Global styles: 6, 7, 11 (in 24 bytes), 20-24 (flags 0 1 2 4 ~7).
TEST_F(ReadCases, Rows) {
    ANStyleTable *global = nullptr;
    ASSERT_EQ(ANInitGlobalHiliteStyles(&global), AN_OK);
    for (const ANHiliteStyle &s :
         {Style(6, 7, 0x111111, 0x222222, 1, 2), Style(7, 7, 1, 1, 1, 1),
          Style(11, 4, 0, 0, 0xFFFE, 0, 24), Style(20, 0, 0xABC, 0xDEF, 5, 6),
          Style(21, 1, 0xABC, 0xDEF, 5, 6), Style(22, 2, 0xABC, 0xDEF, 5, 6),
          Style(23, 4, 0xABC, 0xDEF, 5, 6), Style(24, ~7u, 0xABC, 0xDEF, 5, 6)})
        ASSERT_EQ(ANAddGlobalHiliteStyle(global, &s), AN_OK);
    const Str ten = "..........|", st = "...|H1-3/", map = "phpx/apd/lp||";
    const Str f0 = ten + "H1-3#11 H2-5#12 O4#21 H6-7#11|f ", ev = ten + "W2-6#1/5 W4-8#2 Q5#3/a|e";
    const Str f1 = ten + "H0-1#2 O0#3 H1-2#1 H2-3:0#2|f ";
    // clang-format off
    const Str rows[] = {
        // ---- Range splitting: trimming, pieces, markers at cuts; one notification per range.
        "...Sc..c..||r 1-8|R1-3 M4 R5-7 M7",     "...Sc..c..||r 8-1|R1-3 M4 R5-7 M7",
        "...Sc..c..||r 3-9|M4 R5-7 M7 R8-9",     "...Sc..c..||r44 3-9|M4 R5-7 M7 R8-9",
        "....c....||r 2-2|R2-3",                 "....c....||r 4-4|R4-5",
        "..Ss.....||r 2-6|R4-6",                 ten + "M3|r 3-5|m3 R4-5",
        ten + "M3 R3-5|r 4-7|m3 R4-7",           ten + "H1-4|r 2-5|R2-5",
        ten + "P2|r 2-5|R2-5",                   ten + "R0-2|r 2-4|R0-4",
        ten + "M6|r 6.0-8|m6 R6.0-8",            ten + "M5 M6|r 2-7|R2-7 m5 m6",
        "....SS....||r 1-5|R1-4",                "....S.....|M5 M6|r 1-6|R1-4 m5 m6",
        "..SsS.....||r 2-4|R3-4",                ten + "R2-7|r 3-5|R2-7 R4-5",
        ".hch.||r 1.1-3.8|R1.1-2 M2 R3.5-3.8",   ".hch.|R1.1-3.8|r 1.0-1.0|R1.0-2 m2 R3.5-3.8",
        "...S......|T3|r 3:0-6|R4-6",            "......||r 2-50|R2-5",
        // Past the document's end the one-position case gets the one-step end, not an empty range.
        "......||r 40-50|R40-40.0",              "......||r 60-60|R60-60.0",
        "......||r 5-5|R5-5.0",                  "....c....||r 4-7|M4 R5-7",
        "...cc....||r 1-7|R1-3 M3 M4 R5-7",      "..SSc....||r 0-7|R0-2 M4 R5-7",
        "..pq.Sc..||r 1-8|R1-5 M6 R7-8",         "....c..c..|M4|r 1-9|R1-4 m4 R5-7 M7 R8-9",
        "....cc....|M4|r 1-8|R1-4 m4 M5 R6-8",   "....c..c..|R0-1|r 2-9|R0-1 R2-4 M4 R5-7 M7 R8-9",
        "....cSc...||r 1-9|R1-4 M4 R5-6 M6 R7-9",
        "....cS....||r 1-8|R1-4 M4 R6-8",        "....c.....|M5|r 1-8|R1-4 M4 m5 R6-8",
        ten + "R3-6 P4|r 1-8|R1-8",              "......c...|R2-4|r 0-9|R0-6 M6 R7-9",
        "......c...|R1-4|r 2-8|R1-6 M6 R7-8",    "....c...c.|R5-6|r 1-9|R1-4 M4 R5-8 M8",
        ten + "P4|r 1-8|R1-4:0 M4:0 R4-8",       ten + "T4 P4:1|r 1-8|R1-4:1 M4:1 R4:2-8",
        "..c..c..c..c..c..c..c..c..c..c..c..c..c..c..c..c||r 0-47|R0-2 M2 R3-5 M5 R6-8 M8 R9-11 "
            "M11 R12-14 M14 R15-17 M17 R18-20 M20 R21-23 M23 R24-26 M26 R27-29 M29 R30-32 M32 "
            "R33-35 M35 R36-38 M38 R39-41 M41 R42-44 M44 R45-47",  // the table grows meanwhile
        // A failed step ends its walk (chunker failures are absorbed), the tail's at the end too.
        "...Sc..c..||r 1-8|R1-1.0|CHGetItem 1s", "...Sc..c..||r 1-8|R1-1.0|CHNextItemId 1s",
        "..S.......||r 2-2|R2-3|CHGetItem 1",    "....cSS||r 1-6|R1-4 M4",
        // ---- Tracking. Starts: past all, no cursor, nextChange's kind and index kept; else the
        // first entry not wholly before the position (one ending there too); without annotations
        // only rangeActive and the style flags cleared; without a state nothing touched.
        ten + "O8 H3-4 R1-3|K 9 0 2 3 7|1:-@4294967295:7/01 2:2@1/01 2:2@2/01 2:2@3/01 2:0@8/01",
        ten + "|K 5|0:23130@2779096485.2779096485:7/01",
        "!..........||K 5|0:23130@2779096485.2779096485:7/x1",
        // A stale cursor beyond the table counts as none: found from the head, nothing examined.
        ten + "O8 H3-4 R1-3|j 0 2 0 500|0k500 0k2 0k2",
        // An entry ending at the position is not reported there, but may become the cursor.
        ten + "H1-3/a0 O2/5 R2-3|j 2 4|7k0h0CFF00D0 3k2 0",
        // Words /a0: color1 green, /c0 blue. A range shows at its start and once past its end;
        // markActive left by the caller at the first full call.
        ten + "O8/22 H3-6/9 R1-3|k 0 9|0 1 0 3h1C0DFF 0h1 0h1 2 0 4 0",
        ten + "O1 V3 P5 T7 M7|k 0 9 1|0 20 0 8 0 0 0 0 0 0 48 16 0",
        // A nested highlight wins whatever the slots; of overlapping ones the higher slot takes
        // over; of the same extent the first in the list keeps it; taking over clears the flags.
        ten + "H1-4/a0 H2-3/c0|k 1 5|2h0CFF00D0 2h1CFF0000D0 2h0CFF00D0 2 0",
        ten + "H2-3/c0 H1-4/a0|k 1 5|2h1CFF00D0 2h0CFF0000D0 2h1CFF00D0 2 0",
        ten + "H1-3/a0 H2-4/c0|k 1 4|2h0CFF00D0 2h1CFF0000D0 2h1CFF0000D0 2",
        ten + "H2-4/c0 H1-3/a0|k 1 4|2h1CFF00D0 2h1CFF00D0 2h0CFF0000D0 2",
        ten + "H5-6#7 H1-3/a0 C0#7 H1-3/c0|k 1 3|2h1CFF00D0 0h1 2",
        ten + "H1-4/a0 H2-3/100000c0|k 1 4|2h0CFF00D0 2h1CFF0000d0 2h0CFF00D0 2",
        // ---- Style words: palette, colour-off and ignored bits, style numbers (the document's
        // table first), values written whatever the flags, a style in neither table.
        st + "f|k 1 1|2h0C0DFFFFFF",             st + "1e|k 1 1|2h0C80DFFFF00",
        st + "2d|k 1 1|2h0C8000DFF00FF",         st + "3c|k 1 1|2h0C8080DFF0000",
        st + "4b|k 1 1|2h0C800000DFFFF",         st + "5a|k 1 1|2h0C800080DFF00",
        st + "69|k 1 1|2h0C808000DFF",           st + "78|k 1 1|2h0CC0C0C0D808080",
        st + "1000004c|k 1 1|2h0C800000",        st + "2000004c|k 1 1|2h0DFF0000",
        st + "300000ff|k 1 1|2h0",               st + "8fffff5a|k 1 1|2h0C800080DFF00",
        st + "40000006|k 1 1|2h0C111111D222222A1B2", st + "ffff0006|k 1 1|2h0C111111D222222A1B2",
        "...|Y0 H1-3/40000007|k 1 1|2h0C3D4A3B4",       st + "40000014|k 1 1|2h0cABCdDEFa5b6",
        st + "40000015|k 1 1|2h0CABCdDEFa5b6",   st + "40000016|k 1 1|2h0cABCDDEFa5b6",
        st + "40000017|k 1 1|2h0cABCdDEFA5B6",   st + "40000018|k 1 1|2h0cABCdDEFa5b6",
        st + "4000000b|k 1 1|2h0c0d0AFFFEBFFFF", st + "40000008|k 1 1|2h0",
        // ---- Stepping: c the content step, n the merged walk, t the annotation-text step. The
        // item stands for its first character; annotation text steps to its anchor unread.
        "pxa||c 2|2 2.3 2.4 !25z",               "||c 12.7:3|12.7:3 12.7 !15z",
        // The content step cannot cycle: empty text items, foreign characters, failed steps.
        "pex||n 0|0 1 2.0 2.1 !25",              "pex||c 1.0|1.0 2.0 2.1 !25z",
        "dap||c 1.0|1.0 1.2 1.3 1.4 2 !25z",     "dap||c 0.3|0.3 1.2 1.3 1.4 2 !25z",
        "ap||c 0.0|0.0 !25z|CHNextItemId 1",     "ap||n 0.0|0.0 !25|CHNextItemId 1s",
        "px||c 0|0 1 1.1 !25z|CHGetItem 2",      "pad/p|E2.4|n 2.3|2.3 2.4:0 2.4 65536 !25",
        // The text step takes the first text after the position; text on a text item or on its
        // character 0 never sends the merged walk back.
        "pad/p|T65536 P65536 T65536 T1.1|t 1.2|1.2 65536:0 65536:1 65536:2 65536:3 65536:4 !25",
        "pad/p|T1 T2|n 0|0 1:0 1:1 1 1.1 1.2 2:0 2:1 2 2.4 65536 !25",
        "pad/p|T1 T2|t 1.1|1.1 2:0 2:1 !25",
        "pad/p|T1.0 T2.0|n 0|0 1.0:0 1.0:1 1.0 1.1 1.2 2.0:0 2.0:1 2.0 2.3 2.4 65536 !25",
        "pad/p|T1 T1.0 T1.1 T2 T2.0|n 0|0 1:0 1:1 1 1.1:0 1.1:1 1.1 1.2 2:0 2:1 2 2.4 65536 !25",
        // ---- Events: A [2, 6) wants click 1 and enter, B [4, 8) nothing, C on 5 click 2 and
        // leave (slots 0-2). Clicks reach what covers the position from the slot on; no-event
        // codes and an index naming no listed slot (3 is free) deliver nothing, hover untouched.
        ev + " 2,0,5 1,0,5.0 20,1,5 1,0,6 1,0,1 1,65535,5 4,0,5 11,0,5|2A 2B 2C+ =30 -@4294967295; "
            "1A+ 1B =0 -@4294967295; 32B 32C =30 -@4294967295; 1B =0 -@4294967295; "
            "=0 -@4294967295; =0 -@4294967295; =0 -@4294967295; =0 -@4294967295",
        ev + " 10,0,5 10,3,9 1,500,5 10,10,9 10,0,4 10,1,5 10,1,7 10,0,3 10,0,5 10,65535,9 "
            "10,65535,1 1,0,3|4A+ 4B 4C =30 0@5; =0 0@5; =0 0@5; =0 0@5; 8C+ =30 0@4; 4C =30 1@5; "
            "8C+ =30 1@7; 8B 4A+ =10 0@3; 4B 4C =30 0@5; 8A 8B 8C+ =30 -@9; =0 -@9; 1A+ =10 -@9",
        // ---- Finding: six kinds, both tag tests (mask wins, none finds nothing), the rules
        // passing over ends on an item or at the key, continuing after a previous result.
        f0 + "1M 20 0|21@4-4.0",   f0 + "2M 2 0|12@2-5",      f0 + "1ME 20 0|21@4-4.0",
        f0 + "6- 0 3|!25",         f0 + "6E 21 4.0|!25",      f0 + "5E 11 2|11@6-7",
        f0 + "6M 0 3|12@2-5",      f0 + "4E 11 0|11@6-7",     f0 + "4M 0 0 ^3|21@4-4.0",
        f0 + "4M 0 0 ^9|!25",      f0 + "4M 0 0 _9|11@1-3",   f0 + "4M 0 0 ^4.0|11@6-7",
        f0 + "1M 0 0 ^9|11@1-3",   f0 + "3M 0 5|21@4-4.0",    f1 + "3M 0 5.0|1@1-2",
        f1 + "3M 0 6.0|2@2-3:0",   f1 + "3M 1 6.0|3@0-0.0",   f1 + "3E 2 6.0|2@0-1",
        ten + "T1#100 T3#201 P3#202 T3#203|f 1E 203 0|203@3:3-3",
        // ---- Mapping: ordinals both ways over three chunks (an item: its first character or
        // the next); hidden and wide text counted; two maps cached, a third evicts the older.
        map + "m 0 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16|1.0 1.1 1.2 1.3 1.4 3.5 3.6 "
            "65536.65536 65536.65537 65536.65538 65538.65539 65538.65540 131072.131072 "
            "131072.131073 131072.131074 131072.131075 !25",
        map + "o 1.1 3.6 65538.65540 131072.131075 1 3 0 2 65537 131073 3.1 65538.131073 "
            "65536.65538 327680|1 6 11 15 0 5 0 5 10 16 5 10 9 !25",
        map + "M 0 8 1 9 6 7 13 10 2|1.0/1 65536.65537/2 1.1/2 65536.65538/2 3.6/2 65536.65536/2 "
            "131072.131073/3 65538.65539/3 1.2/4",
        "a/p/f||o 65536|3",                      "adf@1 10000 0||m 5 3 2|2.5 1.3 0.2",
        "adf@1 120000 0||m 5 3 2|2.5 1.3 0.2",   "adf@1 10000 10||m 5 3 2|2.5 1.3 0.2",
        // Maps that failed for the chunker are made again (ordinals past a map: 25); content
        // that cannot be opened is not tried again; reads that fail keep what came before.
        map + "m 6 6 8|!25 3.6 65536.65537|CHGetItemId 1",  map + "o 3.6|0|CHGetItemId 1",
        map + "m 6 6 8|!25 3.6 65536.65537|CHGetItemCountById 1",
        map + "o 3.6|!15|CHGetItemCountById 1",             map + "o 3.6|!25|CHGetRunFromItemId 1",
        map + "m 6 6 8|9.9 9.9 65536.65537|CHGetSectionInfo 1", map + "m 13|9.9|CAReadNext 1",
        map + "m 6 6 8|!18 !25 9.9|DAOpenDocument 1",       map + "o 3.6|!15|DAOpenDocument 1",
        map + "m 6 6 8|!18 !25 9.9|CAOpenContent 1",        map + "o 131072.131073|12|CAReadNext 1",
        map + "m 8 10 7|65536.65537 !25 65536.65536|CAReadNext 3",
    };
    // clang-format on
    for (const Str &row : rows) {
        std::vector<Str> f(1);
        for (const char c : row) c == '|' ? (void)f.emplace_back() : f.back().push_back(c);
        f.resize(5);
        SCOPED_TRACE(row);
        Doc doc(f[0].empty() ? nullptr : Made(f[0], f[1], global));
        for (int fn = 0; !f[4].empty() && fn < static_cast<int>(Fn::Count); ++fn)
            if (f[4].rfind(antk::fnName(Fn(fn)) + Str(" "), 0) == 0)
                antk::failCall(Fn(fn), std::atoi(&f[4][f[4].find(' ')]), 55, f[4].back() == 's');
        const char k = f[2][0], *q = f[2].c_str() + 1;
        const Str got = k == 'r'                           ? Split(doc, q)
                        : k == 'k' || k == 'K' || k == 'j' ? Tracked(doc, q, k)
                        : k == 'f'                         ? Found(doc, q)
                        : k == 'e'                         ? Events(doc, q)
                        : k == 'm' || k == 'o' || k == 'M' ? Mapped(doc, q, k)
                                                           : Walk(doc, q, k);
        antk::clearFailures();
        EXPECT_EQ(got, f[3]);
    }
    ANDeInitGlobalHiliteStyles(global);
}

// The worked example's records: slots in list order, the caller's block owned by the pieces
// only, freed once. Each call failing once, then for good: DAGetAnno's failure is returned,
// unannounced, what was added before stays; the chunker's ends a walk, the range is added.
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
        std::set<Str> kept;
        for (uint64_t n = 0, count = 0; n <= count * 2; ++n) {
            Doc failing(Made("...Sc..c.."));
            const Str got = Split(failing, " 1-8", fn, (n + 1) / 2, n % 2 == 0);
            count = n == 0 ? antk::calls(fn) : count;
            const size_t cut = got.find(" !");
            EXPECT_TRUE(cut == Str::npos || (fn == Fn::DAGetAnno && got.substr(cut) == " !55"))
                << got;
            for (const Entry &e : ListEntries(failing))
                EXPECT_TRUE(e.record.start.itemId >= 1 && e.record.end.itemId <= 8) << got;
            if (cut == Str::npos || n % 2 == 0) continue;
            EXPECT_EQ(Str("R1-3 M4 R5-7 M7").rfind(got.substr(0, cut), 0), 0u) << got;
            kept.insert(got.substr(0, cut));
        }
        EXPECT_EQ(kept.size(), fn == Fn::DAGetAnno ? 4u : 0u) << "before each piece and marker";
    }
}

// A lookup's result and the record: flags color1 color2 attr1 attr2 reserved in hex.
Str Got(DAHandle doc, ANStyleTable *g, uint32_t id) {
    ANHiliteStyle s = Style(id, 1, 2, 3);
    const uint32_t rc = doc ? ANGetHiliteStyle(doc, id, &s) : ANGetGlobalHiliteStyle(g, id, &s);
    return to_string(rc) + ":" +
           Join({Hex(s.flags), Hex(s.color1), Hex(s.color2), Hex(s.attr1), Hex(s.attr2),
                 Hex(s.reserved)});
}

// Style tables keep all 28 bytes; a failed lookup leaves the record alone; replacing by id takes
// the whole record; 24-byte forms get attr2 0xFFFF and reserved 0 (nothing past them is read);
// other sizes are refused; a document's own style shadows the global one.
TEST_F(ReadCases, StyleTablesKeepWhatTheyAreGiven) {
    ANStyleTable *g = nullptr;
    ASSERT_EQ(ANInitGlobalHiliteStyles(&g), AN_OK);
    const ANHiliteStyle a = Style(3, 7, 0x112233, 0x445566, 0x1111, 0x2222, 28, 0xDEADBEEF);
    const ANHiliteStyle b = Style(0xFFFFFFFF, 0, 1, 2, 0, 0xFFFF, 28, 5);
    const ANHiliteStyle replaced = Style(3, 2, 0xCCCCCC, 0, 0, 1), nine = Style(9, 1, 0x99, 0);
    const ANHiliteStyle old = Style(3, 5, 0x0A0B0C, 0x0D0E0F, 0x3344, 0, 24, 0x77777777);
    const auto add = [&](ANHiliteStyle s) { return ANAddGlobalHiliteStyle(g, &s); };
    ASSERT_EQ(add(a) + add(b), AN_OK);
    EXPECT_EQ(Join({Got(nullptr, g, 0), Got(nullptr, g, 3), Got(nullptr, g, 0xFFFFFFFF)}),
              "25:1 2 3 10 20 0 0:7 112233 445566 1111 2222 DEADBEEF 0:0 1 2 0 FFFF 5");
    ASSERT_EQ(add(replaced) + ANGetGlobalHiliteStyle(g, 3, nullptr), AN_OK);
    EXPECT_EQ(Got(nullptr, g, 3), "0:2 CCCCCC 0 0 1 0");
    ASSERT_EQ(add(old), AN_OK);
    for (uint32_t size : {0u, 20u, 23u, 25u, 27u, 29u, 32u})
        EXPECT_EQ(add(Style(3 + size % 2 * 74, 0, 9, 0, 0, 0, size)), 15u);
    EXPECT_EQ(Join({Got(nullptr, g, 3), Got(nullptr, g, 77)}),
              "0:5 A0B0C D0E0F 3344 FFFF 0 25:1 2 3 10 20 0");
    // At the 16-bit limit (65529 styles) a new id is refused with 13, a present one replaced.
    for (uint32_t id = 100; id < 65629; ++id)
        ASSERT_EQ(add(Style(id, 1, id, 0)), id < 65627 ? AN_OK : AN_ERR_NOMEM) << id;
    EXPECT_EQ(add(b), AN_OK);
    EXPECT_EQ(Join({Got(nullptr, g, 65627), Got(nullptr, g, 100), Got(nullptr, g, 65626)}),
              "25:1 2 3 10 20 0 0:1 64 0 10 20 0 0:1 1005A 0 10 20 0");
    Doc doc(PlainDocument(1));
    EXPECT_EQ(Join({to_string(ANAddHiliteStyle(doc, &a)), Got(doc, g, 3)}), "18 0:1 2 3 10 20 0");
    ASSERT_EQ(ANInit(doc, g, nullptr, nullptr), AN_OK);
    EXPECT_EQ(Got(doc, g, 3), "1:5 A0B0C D0E0F 3344 FFFF 0");
    ASSERT_EQ(ANAddHiliteStyle(doc, &old) + ANAddHiliteStyle(doc, &a), AN_OK);  // replaced by id
    EXPECT_EQ(Join({Got(doc, g, 3), Got(nullptr, g, 3), Got(doc, g, 100), Got(doc, g, 4)}),
              "1:7 112233 445566 1111 2222 DEADBEEF 0:5 A0B0C D0E0F 3344 FFFF 0 "
              "1:1 64 0 10 20 0 0:1 2 3 10 20 0");
    // Copying annotations brings the source's styles, each replacing the one with its id; a
    // copy onto itself (every style record then lies in the same table) changes nothing.
    Doc src(Made("...", "H0-1"));
    ASSERT_EQ(ANAddHiliteStyle(src, &replaced) + ANAddHiliteStyle(src, &nine), AN_OK);
    ASSERT_EQ(ANCopyAnnos(doc, src), AN_OK);
    const std::vector<uint8_t> before = TableBytes(doc);
    const Str copied = "1:2 CCCCCC 0 0 1 0 1:1 99 0 10 20 0";
    EXPECT_EQ(Join({Got(doc, 0, 3), Got(doc, 0, 9)}), copied);
    EXPECT_EQ(Join({to_string(ANCopyAnnos(doc, doc)), Got(doc, 0, 3), Got(doc, 0, 9)}),
              "0 " + copied);
    EXPECT_EQ(TableBytes(doc), before);
    ANDeInit(doc);
    ANDeInitGlobalHiliteStyles(g);
}

// Text reads through a track: a placeholder reads 6, nothing past the text; the cached anchor
// answers without the document, and only for itself: (1, -) and (1, 0) sort alike but differ;
// a track never started or already ended is refused.
TEST_F(ReadCases, AnnotationTextReads) {
    Doc doc(Made("pap", "E0 T1 P1.0 T2 P2 T2"));
    ANAnnoTextTrack t{};
    const auto read = [&](const char *pos) {
        uint16_t unit = 0xEEEE;
        const ANPos p = P(pos);
        const Str rc = to_string(ANGetAnnoText(doc, &t, &p, &unit));
        return unit == 0xEEEE ? rc : rc + "=" + char(unit != 0 ? unit : '0');
    };
    EXPECT_EQ(Join({read("0:0"), to_string(ANStartAnnoTextTrack(nullptr, &t)), Show(t.lastPos)}),
              "15 0 0.0");
    EXPECT_EQ(Join({read("2:0"), read("2:1"), read("2:2"), read("2:3"), read("2:4"), read("2:5"),
                    read("2"), Show(t.firstPos), Show(t.lastPos)}),
              "5=a 5=b 6=0 5=a 5=b 25 25 2:0 2:4");
    antk::resetCalls();
    antk::failCall(Fn::DAGetAnno, 1, 66, true);
    EXPECT_EQ(Join({read("2:3"), to_string(antk::calls(Fn::DAGetAnno))}), "5=a 0");
    antk::clearFailures();
    EXPECT_EQ(Join({read("1:1"), read("1.0:0"), read("1:0"), read("0:7")}), "5=b 6=0 5=a 25");
    ASSERT_EQ(ANEndAnnoTextTrack(doc, &t), AN_OK);
    EXPECT_TRUE(t.segs == nullptr && t.firstPos == ANPos{} && t.lastPos == ANPos{});
    EXPECT_EQ(read("2:0"), "15");
}

// Items before their characters, text before its anchor, (7, 0) and (7, -) one anchor, unsigned
// fields; agreement both ways with a key (item; sub-item, - as 0; text first; its index, else -
// before 0) over a generated set. Map records: size 28, a flag, ordinal first; kind kept.
TEST_F(ReadCases, PositionOrderAndMapRecords) {
    for (const char *row :
         {"7<7.0", "7.0<7.1", "7<7.4294967294", "1.0<2147483648.0", "7.3:9<7.3", "7.3:1<7.3:2",
          "7.0:2<7", "7:900<7", "7.5<7.6:0", "6.4294967294<7:0", "7.3:2=7.3:2", "7:2=7.0:2"}) {
        const char *s = row;
        const ANPos a = ParsePos(s), b = P(s + 1);
        EXPECT_TRUE(ANCompPos(&a, &b) == -(*s == '<') && ANCompPos(&b, &a) == (*s == '<')) << row;
    }
    const ANPos kinds[] = {Pos(1, 1, 0), Pos(1, 1, 4), TextPos(1, 1, 0), Pos(1, 1, 6)};
    for (const ANPos &k : kinds) EXPECT_EQ(ANIsAnnoTextPos(&k), k.kind == 5 ? 1u : 0u);
    std::vector<ANPos> all;
    for (uint32_t i : {0u, 1u, 2u, 0x80000000u, 0xFFFFFFFFu})
        for (uint32_t s : {kNo, 0u, 1u, 2u, 0xFFFFFFFEu})
            for (uint32_t k : {0u, 5u, 4u, 6u})
                for (uint32_t x : {0u, 1u, 7u, 0xFFFFFFFFu}) all.push_back(Pos(i, s, k, x));
    const auto key = [](const ANPos &p) {
        const bool text = p.kind == ANPOS_ANNOTEXT;
        return std::make_tuple(p.itemId, p.subItemId == kNo ? 0 : p.subItemId, !text,
                               text ? p.textIndex : p.subItemId != kNo);
    };
    for (const ANPos &a : all) {
        for (const ANPos &b : all) {
            const int expected = key(a) < key(b) ? -1 : key(b) < key(a) ? 1 : 0;
            ASSERT_EQ(ANCompPos(&a, &b), expected) << PosText(a) << " " << PosText(b);
        }
    }
    Doc doc(Made("phpx/apd/lp"));
    for (uint32_t size : {0u, 24u, 27u, 29u, 32u}) EXPECT_EQ(Mapped(doc, " 1", 'm', size), "!15");
    ANMapRecord m{28, 0, Pos(1, 2, 5, 9), 8};
    for (const uint32_t flags : {0u, 4u, 0x80000000u, 3u}) {
        m.flags = flags;
        EXPECT_EQ(ANMapPosition(doc, &m), flags == 3 ? AN_OK : AN_ERR_BADARG);
    }
    EXPECT_EQ(std::tie(m.pos, m.ordinal), std::make_tuple(TextPos(65536, 65537, 9), 8u));
}

}  // namespace
