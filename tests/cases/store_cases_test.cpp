// The annotation store through its interface: tables left by sequences of adding, clearing and
// copying, descriptor forms as stored and heard, freeing userData, building, binding.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <tuple>
#include <vector>

#include "support/fixture.h"
#include "support/table_view.h"
#if defined(__linux__)
#include <dlfcn.h>
#endif

namespace {

using namespace annotest;  // NOLINT(google-build-using-namespace)
using antk::Fn;

constexpr uint32_t kNo = ANPOS_NOSUBITEM, kTop = 0xFFFFFFFF, kPara = antk::kItemParagraph,
                   kEq = ANCLEAR_EQUAL, kAt = 0xFFFFFFF0;  // kAt as an item: the row's anchor
const ANPos kAny{0, 0, 99, 0};                             // a position not checked

ANPos TP(uint32_t item, uint32_t index, uint32_t sub = kNo) { return TextPos(item, sub, index); }
#if ANNO_HAVE_PLATFORM_CONTROLS
void FailNextAllocation() { anwin::failAllocation(1); }
int64_t HeapBlocks() { return anwin::heapBlocks(); }
#else
void FailNextAllocation() {}
int64_t HeapBlocks() { return 0; }
#endif

// 'P': 20 plain items. 'T': text "ab", "hello world", "c" at items 1, 3, 5 (characters 0..13).
DAHandle MakeDoc(char kind) {
    return kind == 'P' ? PlainDocument(20) : antk::loadText("ab\n\nhello world\n\nc");
}
class Store : public LeakCheckedTest {};

// Steps: h hilite, p point, v value point, c cut mark, r range, t text, # placeholder, x clear
// (flags in a.itemId, value in tag), N callback off, F fail an allocation, S go on in the second
// document, K copy it into the first, k the first onto itself. W: where the first of a tag lies.
struct Op {
    char k;
    ANPos a{}, b{};
    uint32_t tag = 1;
    std::u16string text{};
    uint32_t rc = AN_OK;
};
Op H(ANPos a, ANPos b, uint32_t tag = 1) { return {'h', a, b, tag}; }
Op R(ANPos a, ANPos b, uint32_t tag = 1) { return {'r', a, b, tag}; }
Op P(ANPos a, uint32_t tag = 1, char k = 'p') { return {k, a, a, tag}; }
Op T(ANPos a, std::u16string s, uint32_t t = 1, uint32_t rc = 0) { return {'t', a, a, t, s, rc}; }
Op PH(ANPos a, uint32_t tag = 1, uint32_t rc = 0) { return {'#', a, a, tag, u"", rc}; }
Op X(uint16_t flags, uint32_t v, uint32_t rc = 0) { return {'x', Pos(flags), {}, v, u"", rc}; }
Op W(uint32_t tag, ANPos a, ANPos b = kAny) { return {'w', a, b, tag}; }
Op W(uint32_t tag, uint32_t i, uint32_t j = kAt) {
    return W(tag, {kAt, 0, 0, i}, j == kAt ? kAny : ANPos{kAt, 0, 0, j});
}
const Op kSrc{'S'}, kCopy{'K'}, kSelfCopy{'k'}, kFail{'F'}, kQuiet{'N'};

uint32_t Apply(DAHandle d, DAHandle main, DAHandle second, const Op &op) {
    if (op.k == 'h') return AddHilite(d, op.a, op.b, op.tag);
    if (op.k == 'p' || op.k == 'v') return AddPoint(d, op.a, op.tag, 0, op.k == 'p' ? 2 : 4);
    if (op.k == 'c' || op.k == '#') return AddMark(d, op.k == '#' ? 6 : 7, op.a, op.tag);
    if (op.k == 'r') return AddRange(d, op.a, op.b, op.tag);
    if (op.k == 't') return AddText(d, op.a, op.text, op.tag);
    if (op.k == 'x') return ANClearAnnos(d, static_cast<uint16_t>(op.a.itemId), op.tag);
    if (op.k == 'N') return ANSetCallback(d, nullptr, nullptr);
    if (op.k == 'F') FailNextAllocation();
    return op.k == 'K' || op.k == 'k' ? ANCopyAnnos(main, op.k == 'K' ? second : main) : AN_OK;
}

// Records the tags of removed entries and answers each removal in turn.
struct Heard {
    std::vector<uint32_t> answers, removed = {};
    static uint32_t Callback(uint16_t code, uint16_t, void *record, void *self) {
        auto *me = static_cast<Heard *>(self);
        if (code != ANNOTIFY_REMOVED) return 0;
        me->removed.push_back(static_cast<ANAnnoRecord *>(record)->tag);
        return me->removed.size() <= me->answers.size() ? me->answers[me->removed.size() - 1] : 0;
    }
};

// Runs the steps on a fresh document and checks the table left: tags in list order, annotation
// text at `anchor` (placeholders as '#'; null: not read), where entries lie, tags heard removed.
void Check(const char *name, std::vector<Op> ops, std::vector<uint32_t> tags, ANPos anchor = Pos(1),
           const char16_t *text = nullptr, std::vector<Op> where = {},
           std::vector<uint32_t> removed = {}, std::vector<uint32_t> answers = {},
           char kind = 'P') {
    SCOPED_TRACE(name);
    Doc doc(MakeDoc(kind)), second(MakeDoc(kind));
    Heard heard{answers};
    ASSERT_EQ(ANInit(doc, nullptr, &Heard::Callback, &heard), AN_OK);
    ASSERT_EQ(ANInit(second, nullptr, nullptr, nullptr), AN_OK);
    DAHandle at = doc;
    for (size_t i = 0; i < ops.size(); ++i) {
        if (ops[i].k == 'S' || ops[i].k == 'K') at = ops[i].k == 'S' ? second : doc;
        EXPECT_EQ(Apply(at, doc, second, ops[i]), ops[i].rc) << "step " << i;
        ASSERT_EQ(DocumentRulesBroken(at), "") << "step " << i;
    }
    const std::vector<Entry> list = ListEntries(doc);
    std::vector<uint32_t> got;
    for (const Entry &e : list) got.push_back(e.record.tag);
    EXPECT_EQ(got, tags);
    EXPECT_EQ(HasTable(doc), !list.empty()) << "a table left empty is freed";
    EXPECT_EQ(text ? AnchorText(list, anchor, u'#') : u"", text ? text : u"");
    for (Op &w : where) {
        for (ANPos *p : {&w.a, &w.b})
            if (p->itemId == kAt) *p = TextPos(anchor.itemId, anchor.subItemId, p->textIndex);
        size_t i = 0;
        while (i < list.size() && list[i].record.tag != w.tag) ++i;
        ASSERT_LT(i, list.size()) << "tag " << w.tag;
        EXPECT_EQ(list[i].record.start, w.a) << "tag " << w.tag;
        EXPECT_EQ(w.b.kind == kAny.kind ? w.b : list[i].record.end, w.b) << "tag " << w.tag;
    }
    EXPECT_EQ(heard.removed, removed);
}

const std::u16string k40(40, u'x'), k30(30, u'y'), k70 = k40 + k30;
const ANPos kA = Pos(1), kA0 = Pos(1, 0);    // an anchor and the step after it
const ANPos kC = Pos(3, 3), kZ = Pos(1, 0);  // text at a character, at character 0

TEST_F(Store, SequencesLeaveTheirTable) {
    // Adding: text merged into its neighbours, shifts, splits, merges
    Check("TextGoesFirstRangesMergeOnlyRanges",
          {H(Pos(3), Pos(5), 1), T(Pos(3), u"ab", 2), PH(Pos(3), 3), R(Pos(5), Pos(7), 4)},
          {2, 3, 1, 4}, Pos(3), u"ab#", {W(1, Pos(3), Pos(5))});
    Check("TextGoesToTheEntrySpanningIt",
          {T(Pos(2), u"abcdef"), T(TP(2, 2), u"XY"), PH(TP(2, 4)), T(TP(2, 7), u"12"),
           T(TP(2, 5), u"<"), T(TP(2, 4), u">"), T(TP(2, 13), u"!")},
          {1, 1, 1}, Pos(2), u"abXY>#<cd12ef!");
    Check("PlaceholderSplitsAText", {T(Pos(2), u"123456", 9), PH(TP(2, 3), 4)}, {9, 4, 9}, Pos(2),
          u"123#456", {W(9, 3, 4), W(4, 4)});
    Check("PlaceholdersAtTextEnds",
          {T(Pos(2), u"abc", 1), PH(TP(2, 0), 2), PH(Pos(2), 3), PH(TP(2, 4), 4)}, {2, 1, 4, 3},
          Pos(2), u"#abc##", {W(1, 4), W(4, 5), W(3, Pos(2))});
    Check("RangeEndingAtTheAnchor",
          {T(Pos(2), u"abc", 1), H(Pos(1), Pos(2), 2), H(Pos(1), Pos(3), 3), T(Pos(2), u"de", 4)},
          {2, 3, 1}, Pos(2), u"abcde", {W(2, Pos(1), TP(2, 3)), W(3, Pos(1), Pos(3))});
    Check("TextShiftsRangesNotPoints",
          {T(Pos(2), u"abcdef", 1), H(TP(2, 2), Pos(3), 2), H(TP(2, 0), TP(2, 2), 3),
           H(TP(2, 1), TP(2, 4), 4), P(TP(2, 2), 5), P(TP(2, 4), 6), P(TP(2, 1), 7),
           T(TP(2, 2), u"XY", 8)},
          {3, 4, 7, 5, 2, 6, 1}, Pos(2), u"abXYcdef",
          {W(2, 4), W(3, 0, 2), W(4, 1, 6), W(5, 2, 3), W(6, 6, 7), W(7, 1)});
    Check("PointMovedIntoNewText",
          {P(Pos(2), 1), T(Pos(2), u"abc", 2), P(Pos(2), 3), T(Pos(2), u"de", 4)}, {1, 3, 2},
          Pos(2), u"abcde", {W(1, 0), W(3, 3)});
    Check("RangeShiftedPastAPoint",
          {T(Pos(2), u"abcdef", 1), R(TP(2, 2), TP(2, 4), 2), P(TP(2, 2), 3),
           H(TP(2, 2), TP(2, 3), 4), T(TP(2, 2), u"XY", 5)},
          {3, 2, 4, 1});
    Check("ItemEntriesDoNotStopTheShift",
          {H(Pos(3), Pos(3, 7), 1), H(Pos(3), Pos(3, 11), 2), T(Pos(3, 7), u"abcd", 3),
           PH(TP(3, 2, 7), 4), T(TP(3, 1, 7), u"XY", 5)},
          {1, 2, 3, 4, 3}, Pos(3, 7), u"aXYb#cd", {W(1, Pos(3), TP(3, 0, 7))}, {}, {}, 'T');
    Check("RangeEndsNeverBeforeStarts",
          {H(Pos(2), Pos(2), 1), H(Pos(1), kZ, 2), T(Pos(2), u"xy", 3), T(kZ, u"z", 4)},
          {2, 4, 3, 1}, Pos(2), u"xy", {W(1, Pos(2), Pos(2)), W(2, Pos(1), kZ)}, {}, {}, 'T');
    Check("EmptyRangeStaysEmpty", {H(TP(0, 0), Pos(0), 1), PH(Pos(0), 2), PH(TP(0, 0), 3)},
          {3, 1, 2}, Pos(0), u"##", {W(1, 1, 1)});
    Check("TouchingRangesMerge",
          {R(Pos(3), Pos(5), 1), R(Pos(5), Pos(7), 2), R(Pos(1), Pos(3), 3), R(Pos(9), Pos(10), 4),
           R(Pos(6), Pos(8), 5), R(Pos(11), Pos(12), 6), R(Pos(10), Pos(13), 7)},
          {1, 4, 6}, kA, nullptr,
          {W(1, Pos(1), Pos(8)), W(4, Pos(9), Pos(13)), W(6, Pos(10), Pos(13))});
    Check("TextIndexOutsideTextRefused",
          {T(TP(2, 0), u"x", 1, 15), T(Pos(2), u"abc"), PH(Pos(2)), T(TP(2, 5), u"x", 1, 15),
           T(TP(2, 4), u"x", 1, 15), PH(TP(2, 9), 1, 15), PH(TP(3, 0), 1, 15),
           T(TP(2, 1, 0), u"x", 1, 15), T(TP(2, 3), u"x")},
          {1, 1}, Pos(2), u"abcx#");
    // Text indices stop at the greatest instead of wrapping below those they sorted after.
    Check("TextIndicesStopAtTheTop",
          {T(Pos(2), u"ab", 1), P(TP(2, kTop - 1), 2), P(TP(2, kTop), 3), P(TP(2, kTop), 4, 'c'),
           H(TP(2, 1), TP(2, kTop), 5), T(TP(2, kTop), u"t", 6, 15), PH(TP(2, kTop), 6, 15),
           T(Pos(2, kTop - 1), u"t", 6, 15), PH(Pos(2, kTop - 1), 6, 15), T(TP(2, 0), u"xyz", 7)},
          {5, 2, 3, 4, 1}, Pos(2), u"xyzab", {W(2, kTop, kTop), W(3, kTop, kTop), W(5, 4, kTop)});
    // Clearing: the callback's answer, renumbering, collapsing, joins
    Check("LastAnswerReturned",
          {P(Pos(1), 3), P(Pos(2), 3), P(Pos(3), 4), P(Pos(4), 3), X(kEq, 99), X(kEq, 3, 5)}, {4},
          kA, nullptr, {}, {3, 3, 3}, {9, 0, 5});
    Check("RemovedTextRenumbers",
          {T(kA, u"a", 1), PH(kA, 2), T(kA, u"cde", 3), PH(kA, 4), T(kA, u"gh", 5), P(TP(1, 6), 10),
           P(TP(1, 1), 11), H(TP(1, 0), TP(1, 7), 12), P(Pos(0), 13), X(kEq, 3)},
          {13, 12, 1, 11, 2, 4, 10, 5}, kA, u"a##gh",
          {W(10, 3, 4), W(11, 1), W(12, 0, 4), W(4, 3), W(1, 1), W(5, kA), W(13, Pos(0))}, {3});
    Check("LastTextCollapses",
          {T(kA, u"abcd", 1), H(TP(1, 1), TP(1, 2), 2), H(TP(1, 2), Pos(3), 3), P(TP(1, 3), 4),
           P(TP(1, 0), 5, 'c'), H(Pos(0), TP(1, 2), 6), X(kEq, 1)},
          {6, 3, 4}, kA, u"", {W(3, kA, Pos(3)), W(4, kA, kA0), W(6, Pos(0), kA)}, {1});
    Check("TextBeforeBecomesLast", {T(kA, u"ab", 1), PH(kA, 2), X(kEq, 2), T(kA, u"c", 3)}, {1}, kA,
          u"abc", {W(1, kA, kA0)}, {2});
    Check("InnerTextCollapses",
          {T(kA, u"ab", 1), PH(kA, 2), T(kA, u"cde", 3), PH(kA, 4), P(TP(1, 4), 6),
           H(TP(1, 3), TP(1, 5), 7), H(TP(1, 1), TP(1, 4), 8), H(TP(1, 4), Pos(2), 9), X(kEq, 3)},
          {8, 1, 2, 6, 9, 4}, kA, u"ab##", {W(2, 3, 4), W(6, 3, 4), W(8, 1, 3), W(9, 3), W(4, kA)},
          {3});
    Check("RenumberPastItemEntries",
          {T(kC, u"ab", 1), PH(kC, 2), T(kC, u"cd", 3), P(TP(3, 4, 3), 4), H(Pos(3), Pos(4), 5),
           X(kEq, 2)},
          {5, 4, 1}, kC, u"abcd", {W(4, 3), W(1, kC)}, {2}, {}, 'T');
    Check("JoinAtCharacterZero",
          {T(kZ, u"ab", 1), PH(kZ, 2), T(kZ, u"cd", 3), P(TP(1, 1, 0), 4), P(TP(1, 4, 0), 6),
           H(Pos(1), Pos(2), 5), X(kEq, 2)},
          {4, 6, 5, 1}, kZ, u"abcd", {W(1, kZ), W(6, 3)}, {2}, {}, 'T');
    Check("EmptyLastTextGoesWithItsTag", {T(kA, u"abc", 1), PH(kA, 2), T(kA, u"", 1), X(kEq, 1)},
          {2}, kA, u"#", {W(2, kA, kA0)}, {1, 1});
    Check("PlaceholderGoneTextsJoin",
          {T(kA, u"ab", 1), PH(kA, 2), T(kA, u"cde", 3), P(TP(1, 4), 4), P(TP(1, 2), 5), P(kA, 6),
           H(TP(1, 1), TP(1, 5), 7), X(kEq, 2), T(kA, u"f", 8)},
          {7, 5, 4, 6, 1}, kA, u"abcdef", {W(1, kA, kA0), W(4, 3), W(5, 2), W(6, 5), W(7, 1, 4)},
          {2});
    Check("WalkGoesOnBehindReleased",
          {T(kA, u"ab", 1), PH(kA, 2), T(kA, u"cd", 3), P(Pos(2), 2), P(Pos(3), 3),
           T(Pos(5), u"z", 4), H(Pos(5), Pos(5), 5), P(Pos(5), 4), P(Pos(6), 6), X(kEq, 2),
           X(kEq, 4)},
          {1, 3, 6}, kA, u"abcd", {}, {2, 2, 4, 4});
    Check("SelectedTextNotJoined",
          {T(kA, u"ab", 1), PH(kA, 2), T(kA, u"cd", 2), P(TP(1, 3), 3), X(kEq, 2)}, {1, 3}, kA,
          u"ab", {W(1, kA), W(3, kA)}, {2, 2});
    if (ANNO_HAVE_PLATFORM_CONTROLS)  // fails an allocation
        Check("JoinOutOfMemoryGives13",
              {T(kA, k40, 1), PH(kA, 2), T(kA, k30, 3), P(TP(1, 45), 4), kQuiet, kFail,
               X(kEq, 2, 13)},
              {1, 4, 3}, kA, k70.c_str(), {W(1, 40), W(4, 44), W(3, kA)});
    Check("EntryMovedBehindTheWalk",
          {H(TP(1, 1), Pos(1), 7), kSrc, PH(kZ, 7), P(kZ, 3, 'v'), T(kZ, u"", 2), kCopy, X(0, 0)},
          {}, kZ, u"", {}, {7, 7, 2, 3}, {}, 'T');
    // Flags 0 spare bit 31; 0x2000 (tag == value) wins over 0x1000 (tag has value's bits).
    Check("SelectionByFlagsAndTag",
          {P(Pos(0), 2), P(Pos(1), 4), P(Pos(2), 6), P(Pos(3), 7), P(Pos(4), 0x80000007),
           P(Pos(5), 0x80000006), P(Pos(6), 14), X(1, 7), X(0x4000, 14), X(kEq | ANCLEAR_MASK, 6),
           X(kEq | 1, 4), X(0, 0), X(kEq, 0x80000007), X(ANCLEAR_MASK, 6)},
          {}, kA, nullptr, {}, {6, 4, 2, 7, 14, 0x80000007, 0x80000006});
    // Copies merge by position, the destination's entry first on ties; onto itself: nothing
    Check("CopiesMergeByPosition",
          {H(Pos(0), Pos(3), 0xD0), P(Pos(5), 0xD1), kSrc, H(Pos(7), Pos(9), 0x52), P(Pos(4), 0x51),
           P(Pos(5), 0x53, 'v'), H(Pos(0), Pos(1), 0x50), kCopy, kSelfCopy},
          {0xD0, 0x50, 0x51, 0xD1, 0x53, 0x52});
}

// ---- Descriptor forms: the record stored and the one heard, the same but for a point's end,
// heard as given (its start). Bytes past a form's size hold a pattern that must not be read.
using Put = std::pair<uint32_t, uint64_t>;  // offset, value (8 bytes when it needs them)
void CheckForm(uint16_t type, uint32_t size, ANPos a, ANPos b, std::vector<Put> puts, ANPos start,
               ANPos end, uint32_t mask, uint64_t user, uint64_t value, uint64_t at64) {
    SCOPED_TRACE(::testing::Message() << "type " << type << ", " << size << " bytes");
    std::vector<unsigned char> d(96, 0xA5);
    std::memset(d.data(), 0, size);
    std::memcpy(d.data() + 8, &a, sizeof a);
    if (type <= 4 && size >= 40) std::memcpy(d.data() + 24, &b, sizeof b);
    const char16_t *text = u"hello";
    const uint32_t length = type == 5 ? 5 : 0;
    puts.insert(puts.end(), {{0, size}, {4, 0x11}});
    if (type == 5) puts.insert(puts.end(), {{32, uintptr_t(text)}, {40, length}});
    for (const auto &[at, v] : puts) std::memcpy(d.data() + at, &v, v >> 32 != 0 ? 8 : 4);
    Doc doc(PlainDocument(20));
    Notifications heard;
    ASSERT_EQ(ANInit(doc, nullptr, &Notifications::Callback, &heard), AN_OK);
    ASSERT_EQ(ANAddAnno(doc, type, d.data()), AN_OK);
    const std::vector<Entry> list = ListEntries(doc);
    ASSERT_EQ(list.size() * 10 + heard.calls.size(), 11u) << "one entry, heard once";
    const ANAnnoRecord &r = list[0].record, &h = heard.calls[0].record;
    const uint32_t normal = type == 5 ? 96 : (type == 3 || type > 5 ? 64 : 72);
    const bool owns = user != 0 && (type == 1 || type == 3 || type == 5);
    EXPECT_EQ(std::tuple(r.size, r.tag, r.start, r.end, r.eventMask, r.userData, r.value, r.value64,
                         r.textLength, list[0].text, list[0].ownsUserData),
              std::tuple(normal, 0x11u, start, end, mask, user, value, type == 4 ? 0 : at64, length,
                         std::u16string(text, length), owns));
    EXPECT_EQ(std::tuple(h.size, h.tag, h.start, h.end, h.eventMask, h.userData, h.value,
                         h.textLength, h.textBuffer, heard.calls[0].detail),
              std::tuple(normal, 0x11u, start, type == 1 || type == 3 ? end : start, mask, user,
                         value, length, static_cast<uint16_t *>(nullptr), type));
    EXPECT_EQ(h.value64, type == 5 ? uintptr_t(text) : at64) << "style or value at 64, as given";
}

TEST_F(Store, EveryDescriptorFormIsStoredNormalised) {
    const ANPos p = Pos(2, 7), q = Pos(4), m = Pos(3, 2), m1 = Pos(3, 3), t = TP(3, 9, 4);
    CheckForm(1, 72, p, q, {{40, 3}, {48, 0x1122334455}, {56, 77}, {64, 0x40000007}}, p, q, 3,
              0x1122334455, 77, 0x40000007);
    CheckForm(1, 60, q, p, {{40, 5}, {44, 0xDEADBEEF}, {48, 0x9999}, {56, 0x123}}, p, q, 5,
              0xDEADBEEF, 0, 0x123);  // given backwards, stored in order
    CheckForm(1, 48, p, q, {{40, 1}, {44, 0x77}}, p, q, 1, 0, 0, 0x77);
    CheckForm(2, 72, Pos(7), Pos(9), {{40, 2}, {48, 5}, {56, 6}, {64, 0xABCDEF0123}}, Pos(7),
              Pos(7, 0), 2, 5, 6, 0xABCDEF0123);
    CheckForm(4, 72, t, {}, {{56, 42}, {64, 0x77}}, t, TP(3, 10, 4), 0, 0, 42, 0x77);
    for (uint16_t type : {2, 4})
        CheckForm(type, 64, Pos(3), Pos(1), {{40, 0x10}, {44, 0x4444}, {56, 0x5555}}, Pos(3),
                  Pos(3, 0), 0x10, 0x4444, 0, 0x5555);
    CheckForm(2, 32, {9, 0xFF, 4, 0}, {}, {{24, 0x66}}, {9, 0, 0, 0}, {9, 1, 0, 0}, 4, 0, 0, 0x66);
    for (const auto &[size, user] : {Put{48, 0x1234567890}, {44, 0x90}, {40, 0}})
        CheckForm(3, size, Pos(5), Pos(2), {{40, user}}, Pos(2), Pos(5), 0, user, ~0ull << 32, 0);
    CheckForm(5, 48, Pos(3), {}, {{24, 0x8888}}, Pos(3), Pos(3, 0), 0, 0x8888, 0, 0);
    for (uint16_t type : {6, 7}) {
        CheckForm(type, 32, m, {}, {{24, 0x123456789}}, m, m1, 0, 0x123456789, 0, 0);
        CheckForm(type, 28, m, {}, {{24, 0x77}}, m, m1, 0, 0x77, 0, 0);
    }
}

// ---- Copying, and ANClearUserData: it frees once only blocks handed over with types 1, 3, 5.
ANHiliteStyle Style(uint32_t id, uint32_t color) {
    return ANHiliteStyle{ANHILITESTYLE_SIZE, id, ANSTYLE_COLOR1, color, 0, 0, 0, 0};
}
TEST_F(Store, CopyingAndFreeingUserData) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    Doc src(PlainDocument(20)), doc(PlainDocument(20));
    Notifications heard;
    ASSERT_EQ(ANInit(src, nullptr, &Notifications::Callback, &heard), AN_OK);
    ASSERT_EQ(ANInit(doc, nullptr, &Notifications::Callback, &heard), AN_OK);
    for (const ANHiliteStyle &s : {Style(7, 0xFF), Style(8, 0xFF00)}) ANAddHiliteStyle(src, &s);
    for (const ANHiliteStyle &s : {Style(7, 0xFF0000), Style(9, 0x123)}) ANAddHiliteStyle(doc, &s);
    EXPECT_EQ(ANCopyAnnos(doc, src), AN_OK);
    EXPECT_EQ(ANGetHiliteStyle(doc, 8, nullptr), 0u) << "no entries: not even styles";
    const uint64_t shared = NewHeapBlock(8), text = NewHeapBlock(8), kept = NewHeapBlock(8),
                   theirs = NewHeapBlock(8);
    ASSERT_EQ(AddHilite(src, Pos(8), Pos(9), 5, 0x40000007, theirs, 3, 42), AN_OK);
    ASSERT_EQ(AddText(src, Pos(10), u"xyz", 6), AN_OK);
    const std::vector<uint8_t> srcBytes = TableBytes(src);
    heard.calls.clear();
    EXPECT_EQ(ANCopyAnnos(doc, src), AN_OK);  // into an empty table
    EXPECT_EQ(TableBytes(src), srcBytes);
    EXPECT_TRUE(heard.calls.empty());
    const std::vector<Entry> copies = ListEntries(doc), before = ListEntries(src);
    ASSERT_EQ(copies.size(), 2u);
    for (size_t i = 0; i < 2; ++i) {
        EXPECT_EQ(std::memcmp(&copies[i].record, &before[i].record, 80), 0) << i;
        EXPECT_EQ(copies[i].text, before[i].text);
    }
    for (const auto &[id, color] : {Put{7, 0xFF}, {8, 0xFF00}, {9, 0x123}}) {
        ANHiliteStyle got{};
        EXPECT_TRUE(ANGetHiliteStyle(doc, id, &got) == 1 && got.color1 == color) << "style " << id;
    }
    ASSERT_EQ(AddHilite(doc, Pos(1), Pos(2), 1, 0, shared), AN_OK);
    ASSERT_EQ(AddRange(doc, Pos(3), Pos(4), 1, shared), AN_OK);
    ASSERT_EQ(AddText(doc, Pos(6), u"abcd", 1, text), AN_OK);
    ASSERT_EQ(AddMark(doc, AN_TYPE_PLACEHOLDER, TP(6, 2), 2, kept), AN_OK);   // splits the text
    ASSERT_EQ(AddPoint(doc, Pos(5), 3, 0, AN_TYPE_POINT, 0, shared), AN_OK);  // holds, never owns
    ASSERT_EQ(AddPoint(doc, Pos(5), 4, 0, AN_TYPE_VALUE, 0, kept), AN_OK);
    for (const Entry &e : ListEntries(doc)) EXPECT_EQ(e.ownsUserData, e.record.tag == 1);
    const int64_t blocks = HeapBlocks();
    for (int i = 0; i < 2; ++i) EXPECT_EQ(ANClearUserData(doc), AN_OK);
    EXPECT_EQ(HeapBlocks(), blocks - 2) << "the shared block and the split text's, once each";
    const uint64_t after[] = {0, 0, kept, 0, kept, theirs, 0};  // by tag: every holder lets go
    for (const Entry &e : ListEntries(doc)) EXPECT_EQ(e.record.userData, after[e.record.tag]);
    EXPECT_EQ(ANClearUserData(src), AN_OK);
    EXPECT_EQ(HeapBlocks(), blocks - 3);
    FreeHeapBlock(kept);
}

#if defined(__linux__)
// While gLoop is set, the chunker's item reads name a next id that stays (1) or goes back (2).
int gLoop = 0;
uint32_t gFirst = 0, gReads = 0;
}  // namespace
extern "C" uint32_t CHGetItem(CHHandle ch, uint32_t kind, uint32_t id, void *info, uint32_t *next) {
    static const auto real = reinterpret_cast<decltype(&CHGetItem)>(dlsym(RTLD_NEXT, "CHGetItem"));
    const uint32_t rc = real(ch, kind, id, info, next);
    if (gLoop == 0 || kind != 0 || next == nullptr || rc != 0) return rc;
    *next = gLoop == 1 ? id : (id > gFirst + 2 ? gFirst : id + 1);
    return ++gReads > 10000 ? 1 : rc;  // stops a walk that would not end
}
namespace {
#endif

// ---- Building highlights (tag bit 31, userData the first item) from ranges: 0 link; 1 marked
// end, before a text item; 2 field; 3 not built; 4 plain, ending in the next chunk past another
// code's end item and a plain item of its code; 5 uncoloured; 6 no end item; 7 marked, last item.
using Built = std::tuple<uint32_t, uint32_t, uint32_t, ANPos, ANPos>;  // tag, events, style, extent
DAHandle RangeDocument(std::vector<Built> &want) {
    antk::DocumentBuilder b;
    b.textItem("xyz");  // the next text item's characters do not start at 0
    uint32_t first = 0;
    auto span = [&](uint32_t code, uint32_t tag = 0, uint32_t events = 0, uint32_t style = 0) {
        b.range(first = b.item(kPara), code);
        b.item(kPara);
        b.item(antk::kItemRangeEnd, code);
        if (tag != 0) want.emplace_back(tag, events, style, Pos(first), Pos(b.item(kPara)));
    };
    span(0x8003000C, 0x80200000, 15, 0x40001002);
    span(0x80020008);
    const uint32_t text = b.textItem("hello");
    want.emplace_back(0x80100001, 15, 0x40001004, Pos(first),
                      Pos(text, kNo, text, b.charIds(text)[0]));
    span(0x84000010, 0x84000002, 15, 0x40001001);
    span(0x80000001);
    b.range(first = b.item(kPara), 0x81000000);
    b.item(antk::kItemRangeEnd, 0x8003000C);
    b.newChunk();
    b.item(kPara, 0x81000000);
    b.item(antk::kItemRangeEnd, 0x81000000);
    want.emplace_back(0x81000004, 0, 0x40001000, Pos(first), Pos(b.item(kPara)));
    span(0x82000000, 0x82000005, 12, 0x30000000);
    b.range(b.item(kPara), 0x84000010);
    span(0x80020008);
    want.emplace_back(0x80100007, 15, 0x40001004, Pos(first), Pos(kTop, kNo, kTop, kTop));
    return b.build();
}

TEST_F(Store, BuildingMakesOneHighlightPerRangeOnce) {
    std::vector<Built> want;
    Doc doc(RangeDocument(want));
    Notifications heard;
    ASSERT_EQ(ANInit(doc, nullptr, &Notifications::Callback, &heard), AN_OK);
    antk::failCall(Fn::CHGetItemCount, 1, 66);
    EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_EQ(BuildCursor(doc) + heard.calls.size(), 0u) << "no range count: nothing examined";
    EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_EQ(BuildCursor(doc), 8u);
    std::vector<Entry> list = ListEntries(doc);
    ASSERT_EQ(std::pair(list.size(), heard.calls.size()), std::pair(want.size(), want.size()));
    for (size_t i = 0; i < want.size(); ++i) {
        for (const ANAnnoRecord *r : {&list[i].record, &heard.calls[i].record}) {
            EXPECT_EQ(Built(r->tag, r->eventMask, r->style, r->start, r->end), want[i]);
            EXPECT_EQ(r->userData, r->start.itemId);
        }
        EXPECT_FALSE(list[i].ownsUserData);
    }
    antk::resetCalls();
    EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_EQ(antk::calls(Fn::CHGetItemId), 0u) << "every range is examined once";
    EXPECT_EQ(ANClearAnnos(doc, ANCLEAR_MASK, 0x80000000), AN_OK);
    EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
    EXPECT_FALSE(HasTable(doc)) << "cleared ranges are not built again";
#if defined(__linux__)  // the end search ends on a chunker whose next ids go round
    for (int loop : {1, 2}) {
        antk::DocumentBuilder b;
        b.range(gFirst = b.item(kPara), 0x81000000);
        for (int i = 0; i < 5; ++i) b.item(kPara);
        Doc looping(b.build());
        ASSERT_EQ(ANInit(looping, nullptr, nullptr, nullptr), AN_OK);
        std::tie(gLoop, gReads) = std::tuple(loop, 0);
        EXPECT_EQ(ANBuildAnnos(looping), AN_OK);
        gLoop = 0;
        EXPECT_TRUE(gReads > 0 && gReads < 10) << gReads << " reads: the walk went round";
        EXPECT_EQ(BuildCursor(looping), 1u) << "the range is passed over";
        EXPECT_FALSE(HasTable(looping));
    }
#endif
}

TEST_F(Store, BindingMakesFindsAndDropsTheState) {
    // Failing call, option (kTop: no chunker), result, made, module data gone, system asked.
    const std::tuple<Fn, uint32_t, uint32_t, bool, bool, uint64_t> cases[] = {
        {Fn::Count, 0x10, 0, true, false, 0},           // wide content: the system is not asked
        {Fn::Count, 0x0F, 0, true, false, 1},           // other bits: it is
        {Fn::Count, kTop, 0, false, false, 0},          // no chunker: nothing made
        {Fn::DALockModuleData, 0, 42, false, true, 1},  // the module data is destroyed
    };
    for (const auto &[fails, option, rc, made, destroyed, asked] : cases) {
        antk::DocumentBuilder b;
        b.item(kPara);
        option == kTop ? b.noChunker() : b.option(option);
        Doc doc(b.build());
        antk::resetCalls();
        if (fails != Fn::Count) antk::failCall(fails, 1, 42);
        EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), rc) << option;
        EXPECT_EQ(antk::annoSlot(doc) != nullptr, made);
        EXPECT_EQ(antk::moduleDataDestroyed(doc), destroyed);
        EXPECT_EQ(antk::calls(Fn::UTGetOSCharSet), asked);
        EXPECT_EQ(antk::calls(Fn::DAUnlockModuleData), made || destroyed ? 1u : 0u);
    }
    Doc doc(MakeDoc('T'));
    if (ANNO_HAVE_PLATFORM_CONTROLS) {
        FailNextAllocation();
        EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_ERR_NOMEM);
    }
    EXPECT_EQ(ANSetCallback(doc, nullptr, nullptr), AN_ERR_NOSTATE);
    EXPECT_EQ(ANDeInit(doc), AN_OK) << "without state";
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(AddPoint(doc, Pos(1)), AN_OK);
    antk::failCall(Fn::DALockModuleData, 1, 55);
    EXPECT_EQ(ANDeInit(doc), 55u);
    EXPECT_EQ(ListEntries(doc).size(), 1u) << "a failed de-init keeps the state";
    // De-init frees the character maps and the content with the rest, not userData blocks.
    const uint64_t block = NewHeapBlock(8);
    ASSERT_EQ(AddText(doc, Pos(3), u"abc", 2, block), AN_OK);
    ANMapRecord map{ANMAPRECORD_SIZE, ANMAP_POS_TO_ORDINAL, Pos(3, 5), 0};
    ASSERT_EQ(ANMapPosition(doc, &map), AN_OK);
    EXPECT_EQ(ANDeInit(doc), AN_OK);
    EXPECT_EQ(antk::openContents() + antk::openSecondaryDocuments(), 0);
    EXPECT_EQ(ANSetCallback(doc, nullptr, nullptr), AN_ERR_NOSTATE);
    FreeHeapBlock(block);  // still the caller's
    EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK) << "again after de-init";
}

TEST_F(Store, FullTableRefusesWith13) {
#if defined(__SANITIZE_ADDRESS__)
    GTEST_SKIP() << "65529 entries: too slow with the address sanitizer's allocator";
#endif
    Doc doc(PlainDocument(1));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    for (uint32_t i = 0; i < 65528; ++i) ASSERT_EQ(AddPoint(doc, Pos(i)), AN_OK) << i;
    EXPECT_EQ(AddPoint(doc, Pos(65528)), AN_ERR_NOMEM) << "stored, and the table is full";
    EXPECT_EQ(AddText(doc, Pos(0), u"a"), AN_ERR_NOMEM);
    EXPECT_EQ(ListEntries(doc).size(), 65529u);
}

}  // namespace
