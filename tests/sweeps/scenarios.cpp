#include "sweeps/scenarios.h"

#include <cstring>
#include <utility>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "queries/queries.h"
#include "support/fixture.h"

namespace sweep {

namespace {

using annotest::Pos;
using annotest::TextPos;

constexpr uint32_t M = kModuleCode;

}  // namespace

// A document call finds its state first: 18 without one, a DAGetAnno failure passed on.
const Codes kInitCodes{AN_OK, AN_ERR_NOMEM, M};
const Codes kDeInitCodes{AN_OK, M};
const Codes kAddCodes{AN_OK, AN_ERR_NOMEM, AN_ERR_BADARG, AN_ERR_NOSTATE, M};
const Codes kClearCodes{AN_OK, AN_ERR_NOMEM, AN_ERR_NOSTATE, M};
const Codes kClearUserDataCodes{AN_OK, M};
const Codes kCopyCodes{AN_OK, AN_ERR_NOSTATE, M};
const Codes kBuildCodes{AN_OK, AN_ERR_NOSTATE, M};
const Codes kStyleTableCodes{AN_OK, AN_ERR_NOMEM};
// 15: the table could not be made.
const Codes kGlobalStyleAddCodes{AN_OK, AN_ERR_NOMEM, AN_ERR_BADARG};
const Codes kDocStyleAddCodes{AN_OK, AN_ERR_NOMEM, AN_ERR_BADARG, AN_ERR_NOSTATE, M};
const Codes kTextTrackStartCodes{AN_OK, AN_ERR_NOMEM};
// 15: the track could not be started.
const Codes kGetTextCodes{ANTEXT_UNIT_FOUND,
                          ANTEXT_PLACEHOLDER_FOUND,
                          AN_ERR_NOMEM,
                          AN_ERR_BADARG,
                          AN_ERR_NOSTATE,
                          AN_ERR_NOTFOUND,
                          M};
// 15: a map that cannot be made for a position.
const Codes kMapCodes{AN_OK, AN_ERR_NOMEM, AN_ERR_BADARG, AN_ERR_NOSTATE, AN_ERR_NOTFOUND, M};
const Codes kFindCodes{AN_OK, AN_ERR_NOSTATE, AN_ERR_NOTFOUND, M};
const Codes kNextChunkerCodes{AN_OK, AN_ERR_NOSTATE, AN_ERR_NOTFOUND, M};

namespace {

Step Make(std::string name, Act act, Codes codes, Codes outOfMemory = {},
          Codes normal = Codes{AN_OK}) {
    return Step{std::move(name), std::move(act), std::move(codes), std::move(outOfMemory),
                std::move(normal)};
}

std::string Str(const ANPos &p) { return ::testing::PrintToString(p); }

uint64_t BlockOf(const World &w, int block) {
    return block < 0 ? 0 : w.blocks.at(static_cast<size_t>(block));
}

ANHiliteStyle StyleRecord(uint32_t id) {
    ANHiliteStyle s{};
    s.size = ANHILITESTYLE_SIZE;
    s.styleId = id;
    s.flags = ANSTYLE_COLOR1 | ANSTYLE_COLOR2;
    s.color1 = 0x010203 * id;
    s.color2 = 0x030201 * id;
    s.attr1 = static_cast<uint16_t>(id);
    s.attr2 = 7;
    return s;
}

// The older 24-byte form, as a caller would lay it out.
uint32_t AddStyleRecord(uint32_t id, bool olderForm,
                        const std::function<uint32_t(const ANHiliteStyle *)> &add) {
    ANHiliteStyle s = StyleRecord(id);
    if (!olderForm) return add(&s);
    unsigned char old[ANHILITESTYLE_SIZE_OLD] = {};
    s.size = ANHILITESTYLE_SIZE_OLD;
    std::memcpy(old, &s, sizeof old);
    return add(reinterpret_cast<const ANHiliteStyle *>(old));
}

// ANAddAnno, checking that the callback hears of the annotation exactly once when it
// was added, and not at all when the add failed.
uint32_t AddAnno(World &w, size_t doc, uint16_t type, const void *descriptor) {
    auto heardOfAdding = [&w] {
        size_t n = 0;
        for (const annotest::Notification &note : w.notes.calls) n += note.code == ANNOTIFY_ADDED;
        return n;
    };
    const size_t before = heardOfAdding();
    const uint32_t rc = ANAddAnno(w.doc(doc), type, descriptor);
    const auto *state = static_cast<const ANInstance *>(antk::annoSlot(w.doc(doc)));
    const bool listening = state != nullptr && state->callback != nullptr;
    EXPECT_EQ(heardOfAdding() - before, rc == AN_OK && listening ? 1u : 0u)
        << "notifications of adding a type-" << type << " annotation that gave " << rc;
    return rc;
}

}  // namespace

Step InitGlobalStyles() {
    return Make("ANInitGlobalHiliteStyles",
                [](World &w) { return ANInitGlobalHiliteStyles(&w.globalStyles); },
                kStyleTableCodes, {AN_ERR_NOMEM});
}

Step DeInitGlobalStyles() {
    return Make(
        "ANDeInitGlobalHiliteStyles",
        [](World &w) {
            if (w.globalStyles == nullptr) return AN_OK;
            const uint32_t rc = ANDeInitGlobalHiliteStyles(w.globalStyles);
            if (rc == AN_OK) w.globalStyles = nullptr;
            return rc;
        },
        Codes{AN_OK});
}

Step AddGlobalStyle(uint32_t id, bool olderForm) {
    return Make("ANAddGlobalHiliteStyle " + std::to_string(id),
                [id, olderForm](World &w) {
                    return AddStyleRecord(id, olderForm, [&w](const ANHiliteStyle *s) {
                        return ANAddGlobalHiliteStyle(w.globalStyles, s);
                    });
                },
                kGlobalStyleAddCodes, {AN_ERR_NOMEM});
}

Step InitDoc(size_t doc) {
    // Without memory for its style table a document still gets its state.
    return Make("ANInit " + std::to_string(doc),
                [doc](World &w) {
                    return ANInit(w.doc(doc), w.globalStyles, &annotest::Notifications::Callback,
                                  &w.notes);
                },
                kInitCodes, {AN_OK, AN_ERR_NOMEM});
}

Step DeInitDoc(size_t doc) {
    return Make(
        "ANDeInit " + std::to_string(doc), [doc](World &w) { return ANDeInit(w.doc(doc)); },
        kDeInitCodes);
}

Step AddDocStyle(size_t doc, uint32_t id, bool olderForm) {
    return Make("ANAddHiliteStyle " + std::to_string(id),
                [doc, id, olderForm](World &w) {
                    return AddStyleRecord(id, olderForm, [&w, doc](const ANHiliteStyle *s) {
                        return ANAddHiliteStyle(w.doc(doc), s);
                    });
                },
                kDocStyleAddCodes, {AN_ERR_NOMEM});
}

Step GetDocStyle(size_t doc, uint32_t id) {
    return Make(
        "ANGetHiliteStyle " + std::to_string(id),
        [doc, id](World &w) {
            ANHiliteStyle s{};
            return ANGetHiliteStyle(w.doc(doc), id, &s);
        },
        Codes{0, 1}, {}, Codes{1});
}

Step AddHilite(size_t doc, ANPos start, ANPos end, uint32_t tag, uint32_t style, int block,
               uint32_t form) {
    return Make("add highlight " + std::to_string(tag) + " (" + std::to_string(form) + " bytes)",
                [=](World &w) {
                    ANAnnoRecord d{};
                    d.size = form;
                    d.tag = tag;
                    d.start = start;
                    d.end = end;
                    d.eventMask = ANEVENT_CLICK1 | ANEVENT_ENTER | ANEVENT_LEAVE;
                    unsigned char bytes[sizeof(ANAnnoRecord)] = {};
                    std::memcpy(bytes, &d, sizeof d);
                    const uint64_t userData = BlockOf(w, block);
                    if (form == 72) {
                        std::memcpy(bytes + 48, &userData, 8);
                        std::memcpy(bytes + 64, &style, 4);
                    } else if (form == 60) {
                        std::memcpy(bytes + 56, &style, 4);  // userData (44) stays 0
                    } else {
                        std::memcpy(bytes + 44, &style, 4);
                    }
                    return AddAnno(w, doc, AN_TYPE_HILITE, bytes);
                },
                kAddCodes, {AN_ERR_NOMEM});
}

Step AddPoint(size_t doc, ANPos pos, uint32_t tag, uint16_t type, uint32_t form) {
    return Make("add point " + std::to_string(tag) + " of type " + std::to_string(type) + " (" +
                    std::to_string(form) + " bytes)",
                [=](World &w) {
                    unsigned char bytes[sizeof(ANAnnoRecord)] = {};
                    const uint64_t value = 1000 + tag;
                    std::memcpy(bytes, &form, 4);
                    std::memcpy(bytes + 4, &tag, 4);
                    if (form == 32) {
                        std::memcpy(bytes + 8, &pos.itemId, 4);
                        std::memcpy(bytes + 24, &value, 8);
                    } else {
                        std::memcpy(bytes + 8, &pos, sizeof pos);
                        std::memcpy(bytes + 24, &pos, sizeof pos);
                        const uint32_t mask = ANEVENT_CLICK2;
                        std::memcpy(bytes + 40, &mask, 4);
                        std::memcpy(bytes + 56, &value,
                                    8);  // value, or the 64-byte form's 64-bit value
                    }
                    return AddAnno(w, doc, type, bytes);
                },
                kAddCodes, {AN_ERR_NOMEM});
}

Step AddRange(size_t doc, ANPos start, ANPos end, uint32_t tag, int block, uint32_t form) {
    // Fitting a range reads annotation text through a text track of its own, and a
    // failure there only means a position is not taken for a cut.
    return Make("add range " + std::to_string(tag) + " (" + std::to_string(form) + " bytes)",
                [=](World &w) {
                    ANRangeDesc d{};
                    d.size = form;
                    d.tag = tag;
                    d.start = start;
                    d.end = end;
                    d.userData = form == 48 ? BlockOf(w, block) : 0;
                    return AddAnno(w, doc, AN_TYPE_RANGE, &d);
                },
                kAddCodes, {AN_OK, AN_ERR_NOMEM});
}

Step AddText(size_t doc, ANPos pos, std::u16string text, uint32_t tag, int block) {
    return Make("add text " + std::to_string(tag) + " of " + std::to_string(text.size()) + " at " +
                    Str(pos),
                [=](World &w) {
                    ANTextDesc d{};
                    d.size = sizeof d;
                    d.tag = tag;
                    d.pos = pos;
                    d.userData = BlockOf(w, block);
                    d.text = reinterpret_cast<const uint16_t *>(text.data());
                    d.textLength = static_cast<uint32_t>(text.size());
                    return AddAnno(w, doc, AN_TYPE_TEXT, &d);
                },
                kAddCodes, {AN_ERR_NOMEM});
}

Step AddUnit(size_t doc, ANPos pos, uint32_t tag, uint16_t type, uint32_t form) {
    return Make(
        "add unit " + std::to_string(tag) + " of type " + std::to_string(type) + " at " + Str(pos),
        [=](World &w) {
            ANPointDesc d{};
            d.size = form;
            d.tag = tag;
            d.pos = pos;
            return AddAnno(w, doc, type, &d);
        },
        kAddCodes, {AN_ERR_NOMEM});
}

Step Clear(size_t doc, uint16_t flags, uint32_t value) {
    // With a callback the last notification decides the result, also after a failed join.
    return Make("ANClearAnnos " + std::to_string(flags) + "/" + std::to_string(value),
                [=](World &w) { return ANClearAnnos(w.doc(doc), flags, value); }, kClearCodes,
                {AN_OK, AN_ERR_NOMEM});
}

Step ClearUserData(size_t doc) {
    return Make(
        "ANClearUserData " + std::to_string(doc),
        [doc](World &w) {
            World only;
            only.docs = {w.doc(doc)};
            const std::set<uint64_t> before = OwnedBlocks(only);
            const uint32_t rc = ANClearUserData(w.doc(doc));
            const std::set<uint64_t> after = OwnedBlocks(only);
            for (uint64_t block : before) {
                if (after.count(block) == 0) w.freedBlocks.insert(block);
            }
            only.docs.clear();
            return rc;
        },
        kClearUserDataCodes);
}

Step StartTextTrack(size_t track) {
    return Make("ANStartAnnoTextTrack " + std::to_string(track),
                [track](World &w) { return ANStartAnnoTextTrack(nullptr, &w.texts.at(track)); },
                kTextTrackStartCodes, {AN_ERR_NOMEM});
}

Step EndTextTrack(size_t track) {
    return Make(
        "ANEndAnnoTextTrack " + std::to_string(track),
        [track](World &w) { return ANEndAnnoTextTrack(nullptr, &w.texts.at(track)); },
        Codes{AN_OK});
}

Step GetText(size_t doc, size_t track, ANPos pos) {
    return Make(
        "ANGetAnnoText at " + Str(pos),
        [=](World &w) {
            uint16_t unit = 0;
            return ANGetAnnoText(w.doc(doc), &w.texts.at(track), &pos, &unit);
        },
        kGetTextCodes, {AN_ERR_NOMEM}, Codes{ANTEXT_UNIT_FOUND, ANTEXT_PLACEHOLDER_FOUND});
}

Step MapOrdinal(size_t doc, uint32_t ordinal) {
    return Make("ANMapPosition ordinal " + std::to_string(ordinal),
                [=](World &w) {
                    ANMapRecord m{};
                    m.size = ANMAPRECORD_SIZE;
                    m.flags = ANMAP_ORDINAL_TO_POS;
                    m.ordinal = ordinal;
                    return ANMapPosition(w.doc(doc), &m);
                },
                kMapCodes, {AN_ERR_NOMEM});
}

Step MapPos(size_t doc, ANPos pos) {
    // Without memory for the map, a position cannot be mapped: 15.
    return Make("ANMapPosition position " + Str(pos),
                [=](World &w) {
                    ANMapRecord m{};
                    m.size = ANMAPRECORD_SIZE;
                    m.flags = ANMAP_POS_TO_ORDINAL;
                    m.pos = pos;
                    return ANMapPosition(w.doc(doc), &m);
                },
                kMapCodes, {AN_ERR_BADARG});
}

Step Find(size_t doc, uint16_t mode, uint32_t tag, ANPos key, uint16_t flags) {
    return Make(
        "ANFindAnno mode " + std::to_string(mode) + " tag " + std::to_string(tag),
        [=](World &w) {
            ANFindRecord f{};
            f.size = ANFINDRECORD_SIZE;
            f.mode = mode;
            f.tag = tag;
            f.key = key;
            return ANFindAnno(w.doc(doc), flags, &f);
        },
        kFindCodes);
}

Step Event(size_t doc, uint32_t event, uint16_t entry, ANPos pos) {
    return Make(
        "ANAnnoEvent " + std::to_string(event) + " at " + Str(pos),
        [=](World &w) { return ANAnnoEvent(w.doc(doc), event, entry, &pos); }, Codes{0});
}

Step NextChunkerPos(size_t doc, ANPos pos) {
    return Make(
        "ANNextChunkerPos " + Str(pos),
        [=](World &w) {
            ANPos next{};
            return ANNextChunkerPos(w.doc(doc), &pos, &next);
        },
        kNextChunkerCodes);
}

Step NextAnnoTextPos(size_t doc, ANPos pos) {
    return Make(
        "ANNextAnnoTextPos " + Str(pos),
        [=](World &w) {
            ANPos next{};
            return ANNextAnnoTextPos(w.doc(doc), &pos, &next);
        },
        kNextChunkerCodes);
}

Step NextPos(size_t doc, ANPos pos) {
    return Make(
        "ANNextPos " + Str(pos),
        [=](World &w) {
            ANPos next{};
            return ANNextPos(w.doc(doc), &pos, &next);
        },
        Codes{AN_OK, AN_ERR_NOTFOUND});
}

Step SetCallback(size_t doc, bool on) {
    return Make(
        std::string("ANSetCallback ") + (on ? "on" : "off"),
        [=](World &w) {
            return on ? ANSetCallback(w.doc(doc), &annotest::Notifications::Callback, &w.notes)
                      : ANSetCallback(w.doc(doc), nullptr, nullptr);
        },
        Codes{AN_OK, AN_ERR_NOSTATE, M});
}

Step Copy(size_t dest, size_t src) {
    // Entries that cannot be copied are only missing from the destination.
    return Make("ANCopyAnnos " + std::to_string(src) + " to " + std::to_string(dest),
                [=](World &w) { return ANCopyAnnos(w.doc(dest), w.doc(src)); }, kCopyCodes,
                {AN_OK});
}

Step Build(size_t doc) {
    // Ranges that cannot be added are passed over.
    return Make("ANBuildAnnos " + std::to_string(doc),
                [=](World &w) { return ANBuildAnnos(w.doc(doc)); }, kBuildCodes, {AN_OK});
}

Step Walk(size_t doc, ANPos from, size_t track, size_t text) {
    return Make(
        "walk from " + Str(from),
        [=](World &w) -> uint32_t {
            constexpr uint32_t kLimit = 20000;
            ANTrackInfo &t = w.tracks.at(track);
            t = ANTrackInfo{};
            const uint32_t state = ANStartAnnoTrack(w.doc(doc), &from, &t);
            EXPECT_LE(state, ANTRACK_ACTIVE);
            ANPos p = from;
            uint32_t visited = 0;
            for (; visited < kLimit; ++visited) {
                const uint32_t bits = ANTrackAnno(w.doc(doc), &p, &t);
                EXPECT_EQ(bits & ~uint32_t{0x3F}, 0u) << "tracking at " << Str(p);
                if (p.kind == ANPOS_ANNOTEXT) {
                    uint16_t unit = 0;
                    const uint32_t rc = ANGetAnnoText(w.doc(doc), &w.texts.at(text), &p, &unit);
                    EXPECT_TRUE(kGetTextCodes.contains(rc)) << "text at " << Str(p) << ": " << rc;
                }
                ANPos next{};
                const uint32_t rc = ANNextPos(w.doc(doc), &p, &next);
                EXPECT_TRUE(rc == AN_OK || rc == AN_ERR_NOTFOUND) << "step from " << Str(p);
                if (rc != AN_OK) break;
                EXPECT_LT(ANCompPos(&p, &next), 0) << "the walk turns back at " << Str(p);
                p = next;
            }
            EXPECT_LT(visited, kLimit) << "the walk does not end";
            EXPECT_EQ(ANEndAnnoTrack(w.doc(doc), &t), 0u);
            return visited;
        },
        Codes::Any(), {}, Codes::Any());
}

// ---- Scenarios -------------------------------------------------------------------------

namespace {

constexpr uint32_t kPlainItems = 30;

// 30 plain items (ids 0 to 29), then a text item (id 30) of 12 characters (0 to 11).
DAHandle PlainAndTextDocument() {
    antk::DocumentBuilder builder;
    for (uint32_t i = 0; i < kPlainItems; ++i) builder.item(antk::kItemParagraph);
    builder.textItem("hello, world");
    return builder.build();
}

constexpr uint32_t kTextItem = kPlainItems;

}  // namespace

Scenario StylesAndAnnotations() {
    Scenario s;
    s.name = "styles and annotations";
    s.prepare = [](World &w) {
        w.docs.push_back(PlainAndTextDocument());
        for (int i = 0; i < 3; ++i) w.NewBlock();
    };
    std::vector<Step> &st = s.steps;
    st.push_back(InitGlobalStyles());
    for (uint32_t id = 1; id <= 11; ++id) st.push_back(AddGlobalStyle(id, id == 3));
    st.push_back(AddGlobalStyle(4));  // replaces
    st.push_back(InitDoc(0));
    for (uint32_t id = 101; id <= 111; ++id) st.push_back(AddDocStyle(0, id, id == 104));
    st.push_back(AddDocStyle(0, 5));  // shadows a global style
    st.push_back(GetDocStyle(0, 5));
    st.push_back(GetDocStyle(0, 11));

    const uint32_t numbered = ANSTYLEWORD_NUMBER;
    st.push_back(AddHilite(0, Pos(1), Pos(4), 1, numbered | 5, 0, 72));
    st.push_back(AddHilite(0, Pos(3), Pos(2), 2, numbered | 103, -1, 60));
    st.push_back(AddHilite(0, Pos(5), Pos(9), 3, 0xF1, -1, 48));
    st.push_back(AddPoint(0, Pos(6), 4, AN_TYPE_POINT, 72));
    st.push_back(AddPoint(0, Pos(7), 5, AN_TYPE_POINT, 64));
    st.push_back(AddPoint(0, Pos(8), 6, AN_TYPE_POINT, 32));
    st.push_back(AddPoint(0, Pos(9), 7, AN_TYPE_VALUE, 72));
    st.push_back(AddPoint(0, Pos(10), 8, AN_TYPE_VALUE, 64));
    st.push_back(AddRange(0, Pos(10), Pos(14), 9, 1, 48));
    st.push_back(AddRange(0, Pos(20), Pos(22), 10, -1, 44));
    st.push_back(AddRange(0, Pos(12), Pos(16), 11, -1, 40));
    st.push_back(AddUnit(0, Pos(15), 12, AN_TYPE_CUTMARK, 32));
    st.push_back(AddUnit(0, Pos(16), 13, AN_TYPE_CUTMARK, 28));
    st.push_back(AddUnit(0, Pos(17), 14, AN_TYPE_PLACEHOLDER, 32));
    st.push_back(AddUnit(0, Pos(18), 15, AN_TYPE_PLACEHOLDER, 28));
    st.push_back(AddText(0, Pos(19), u"abc", 16, 2));
    for (uint32_t i = 0; i < 8; ++i) st.push_back(AddPoint(0, Pos(21 + i), 17 + i));
    st.push_back(AddHilite(0, Pos(kTextItem, 1), Pos(kTextItem, 3), 0x80000001, 0x30000000));

    st.push_back(Walk(0, Pos(0), 0, 0));
    st.push_back(Find(0, ANFIND_FIRST | ANFIND_MASK, 0));
    st.push_back(Find(0, ANFIND_LAST | ANFIND_EQUAL, 9));
    st.push_back(Find(0, ANFIND_BEFORE | ANFIND_MASK, 1, Pos(12)));
    st.push_back(Find(0, ANFIND_AFTER | ANFIND_MASK, 1, Pos(3), ANFIND_AFTER_PREVIOUS));
    st.push_back(Find(0, ANFIND_FROM | ANFIND_MASK, 0, Pos(19)));
    st.push_back(Find(0, ANFIND_AT | ANFIND_MASK, 0, Pos(2)));
    st.push_back(Event(0, ANEVENT_CLICK1, 0, Pos(2)));
    st.push_back(Event(0, ANEVENT_MOVE, 0, Pos(3)));
    st.push_back(Event(0, ANEVENT_MOVE, AN_NONE, Pos(29)));

    st.push_back(Clear(0, ANCLEAR_EQUAL, 4));
    st.push_back(Clear(0, ANCLEAR_MASK, 0x10));
    st.push_back(ClearUserData(0));
    st.push_back(Clear(0, 0, 0));
    st.push_back(DeInitDoc(0));
    st.push_back(DeInitGlobalStyles());
    return s;
}

Scenario AnnotationText() {
    Scenario s;
    s.name = "annotation text";
    s.prepare = [](World &w) {
        w.docs.push_back(PlainAndTextDocument());
        w.NewBlock();
    };
    std::vector<Step> &st = s.steps;
    st.push_back(InitDoc(0));
    // One text at item 3 grown by appending (past 64 and 128 units) and by inserting.
    st.push_back(AddText(0, Pos(3), u"abc", 10, 0));
    st.push_back(AddText(0, Pos(3), std::u16string(123, u'x'), 11));
    st.push_back(AddText(0, TextPos(3, ANPOS_NOSUBITEM, 1), u"INS", 12));
    st.push_back(AddHilite(0, TextPos(3, ANPOS_NOSUBITEM, 2), TextPos(3, ANPOS_NOSUBITEM, 30), 13));
    st.push_back(AddUnit(0, TextPos(3, ANPOS_NOSUBITEM, 20), 14, AN_TYPE_CUTMARK));
    st.push_back(AddPoint(0, TextPos(3, ANPOS_NOSUBITEM, 40), 15));
    // A placeholder inside it splits it.
    st.push_back(AddUnit(0, TextPos(3, ANPOS_NOSUBITEM, 10), 66));
    // Six segments at item 5: texts and placeholders in turn.
    st.push_back(AddText(0, Pos(5), u"ab", 20));
    st.push_back(AddUnit(0, Pos(5), 21));
    st.push_back(AddText(0, Pos(5), u"cd", 22));
    st.push_back(AddUnit(0, Pos(5), 67));
    st.push_back(AddText(0, Pos(5), u"ef", 24));
    st.push_back(AddUnit(0, Pos(5), 25));
    st.push_back(AddPoint(0, Pos(5), 26));
    // Text at a character, and an empty text.
    st.push_back(AddText(0, Pos(kTextItem, 2), u"zz", 27));
    st.push_back(AddText(0, Pos(7), u"", 28));
    // Text on the text item itself and at its first character: one anchor in the order.
    st.push_back(AddText(0, Pos(kTextItem), u"on item", 29));
    st.push_back(AddText(0, Pos(kTextItem, 0), u"at char", 30));
    st.push_back(AddHilite(0, Pos(kTextItem), Pos(kTextItem, 1), 31));
    st.push_back(AddUnit(0, TextPos(kTextItem, ANPOS_NOSUBITEM, 3), 32));
    st.push_back(AddUnit(0, Pos(kTextItem, 0), 32));

    st.push_back(StartTextTrack(0));
    st.push_back(GetText(0, 0, TextPos(5, ANPOS_NOSUBITEM, 0)));
    st.push_back(GetText(0, 0, TextPos(5, ANPOS_NOSUBITEM, 4)));
    st.push_back(GetText(0, 0, TextPos(3, ANPOS_NOSUBITEM, 12)));
    st.push_back(GetText(0, 0, TextPos(kTextItem, 2, 1)));
    st.push_back(StartTextTrack(1));
    st.push_back(Walk(0, Pos(0), 0, 1));
    st.push_back(NextChunkerPos(0, Pos(kTextItem, 3)));
    st.push_back(NextAnnoTextPos(0, TextPos(5, ANPOS_NOSUBITEM, 3)));
    st.push_back(NextPos(0, TextPos(5, ANPOS_NOSUBITEM, 5)));
    st.push_back(Find(0, ANFIND_FIRST | ANFIND_EQUAL, 66));
    st.push_back(Find(0, ANFIND_FIRST | ANFIND_EQUAL, 25));
    st.push_back(Find(0, ANFIND_AT | ANFIND_MASK, 0, TextPos(3, ANPOS_NOSUBITEM, 5)));

    // Removing the placeholders joins the texts around them.
    // Without a callback, a join that runs out of memory shows in the result.
    st.push_back(SetCallback(0, false));
    st.push_back(OnOutOfMemory(Clear(0, ANCLEAR_EQUAL, 66), {AN_ERR_NOMEM}));
    st.push_back(SetCallback(0, true));
    st.push_back(Clear(0, ANCLEAR_EQUAL, 67));
    st.push_back(GetText(0, 0, TextPos(5, ANPOS_NOSUBITEM, 2)));
    st.push_back(Walk(0, Pos(0), 1, 1));
    st.push_back(EndTextTrack(0));
    st.push_back(ClearUserData(0));
    st.push_back(Clear(0, ANCLEAR_EQUAL, 12));
    st.push_back(Clear(0, ANCLEAR_EQUAL, 29));
    st.push_back(Clear(0, ANCLEAR_EQUAL, 32));
    st.push_back(Clear(0, ANCLEAR_MASK, 0));
    st.push_back(EndTextTrack(1));
    st.push_back(DeInitDoc(0));
    return s;
}

Scenario Mapping() {
    Scenario s;
    s.name = "mapping";
    s.prepare = [](World &w) {
        for (int d = 0; d < 2; ++d) {
            antk::DocumentBuilder builder;
            if (d == 1) builder.option(0x10);  // content read two bytes a character
            for (uint32_t chunk = 0; chunk < 3; ++chunk) {
                builder.item(antk::kItemParagraph);
                builder.textItem("chunk text " + std::to_string(chunk));
                const uint32_t hidden = builder.textItem("hidden");
                builder.hideItemText(hidden, chunk == 1 ? 0x10000 : 0);
                builder.item(antk::kItemParagraph);
                builder.textItem("odd");
                if (chunk == 1) {
                    builder.newSection();
                } else {
                    builder.newChunk();
                }
            }
            w.docs.push_back(builder.build());
        }
    };
    std::vector<Step> &st = s.steps;
    for (size_t d = 0; d < 2; ++d) {
        st.push_back(InitDoc(d));
        st.push_back(MapOrdinal(d, 3));                  // chunk 0
        st.push_back(MapOrdinal(d, 30));                 // chunk 1
        st.push_back(MapOrdinal(d, 4));                  // chunk 0 again: a swap
        st.push_back(MapOrdinal(d, 55));                 // chunk 2: evicts chunk 1
        st.push_back(MapPos(d, Pos(0x10001, 0x10002)));  // chunk 1 again
        st.push_back(MapPos(d, Pos(0x20003)));
        st.push_back(Expect(MapOrdinal(d, 100000), {AN_ERR_NOTFOUND}));  // past the end
    }
    st.push_back(DeInitDoc(0));
    return s;
}

Scenario RangeSplitting() {
    Scenario s;
    s.name = "range splitting";
    s.prepare = [](World &w) {
        antk::DocumentBuilder builder;
        for (uint32_t i = 0; i < 24; ++i) {
            if (i == 2 || i == 6 || i == 11 || i == 12 || i == 20) {
                builder.cutItem();
            } else if (i == 4 || i == 13) {
                builder.skippedItem(antk::kItemSkip);
            } else if (i == 9) {
                builder.skippedItem(antk::kItemSkip2);
            } else if (i == 7) {
                builder.textItem("abcdef");  // characters 0 to 5
            } else {
                builder.item(antk::kItemParagraph);
            }
        }
        w.docs.push_back(builder.build());
        w.NewBlock();
        w.NewBlock();
    };
    std::vector<Step> &st = s.steps;
    st.push_back(InitDoc(0));
    // Annotation text at item 3 with a placeholder in it: a cut inside the text.
    st.push_back(AddText(0, Pos(3), u"xy", 40));
    st.push_back(AddUnit(0, Pos(3), 41));
    st.push_back(AddText(0, Pos(3), u"zw", 42));
    st.push_back(AddUnit(0, Pos(6), 43, AN_TYPE_CUTMARK));  // a cut already marked
    st.push_back(AddRange(0, Pos(0), Pos(16), 44, 0));
    st.push_back(AddRange(0, Pos(7, 1), Pos(7, 4), 45));
    st.push_back(AddRange(0, Pos(15), Pos(18), 46, 1));       // overlaps the first: merged
    st.push_back(AddRange(0, Pos(13), Pos(14), 47, -1, 40));  // on a skipped item
    st.push_back(AddRange(0, Pos(19), Pos(19), 48, -1, 44));  // empty: one step
    st.push_back(AddRange(0, Pos(23), Pos(21), 49));          // given backwards
    st.push_back(AddRange(0, Pos(12), Pos(22), 50));          // over existing pieces
    st.push_back(StartTextTrack(0));
    st.push_back(Walk(0, Pos(0), 0, 0));
    st.push_back(Find(0, ANFIND_AFTER | ANFIND_EQUAL, 44, Pos(1)));
    st.push_back(Clear(0, ANCLEAR_EQUAL, 44));
    st.push_back(ClearUserData(0));
    st.push_back(AddRange(0, Pos(0), Pos(8), 51));  // again where pieces were
    st.push_back(Clear(0, ANCLEAR_EQUAL, 41));      // the placeholder: its texts join
    st.push_back(Walk(0, Pos(0), 1, 0));
    st.push_back(EndTextTrack(0));
    st.push_back(DeInitDoc(0));
    return s;
}

Scenario CopyingAndBuilding() {
    Scenario s;
    s.name = "copying and building";
    s.prepare = [](World &w) {
        // Range codes the library builds highlights from, and one it passes over.
        constexpr uint32_t kCodes[] = {0x8003000C, 0x80020008, 0x84000010,
                                       0x81000000, 0x82000000, 0x12345678};
        w.docs.push_back(PlainAndTextDocument());  // 0: the source
        w.docs.push_back(PlainAndTextDocument());  // 1: a destination with annotations
        w.docs.push_back(PlainAndTextDocument());  // 2: an empty destination
        antk::DocumentBuilder builder;             // 3: a document with its own ranges
        for (uint32_t r = 0; r < 12; ++r) {
            const uint32_t code = kCodes[r % 6];
            const uint32_t first = builder.item(antk::kItemParagraph);
            builder.range(first, code);
            builder.textItem("in range");
            if (r != 7) builder.item(antk::kItemRangeEnd, code);  // range 7 never ends
        }
        builder.textItem("after");
        w.docs.push_back(builder.build());
        w.NewBlock();
    };
    std::vector<Step> &st = s.steps;
    for (size_t d = 0; d < 4; ++d) st.push_back(InitDoc(d));
    for (uint32_t id = 1; id <= 12; ++id) st.push_back(AddDocStyle(0, id));
    st.push_back(AddDocStyle(1, 5));
    st.push_back(AddDocStyle(1, 50));
    st.push_back(AddText(0, Pos(3), std::u16string(70, u's'), 60, 0));
    st.push_back(AddUnit(0, TextPos(3, ANPOS_NOSUBITEM, 30), 61));
    st.push_back(AddText(0, Pos(8), u"src", 62));
    st.push_back(AddHilite(0, Pos(1), Pos(5), 63, ANSTYLEWORD_NUMBER | 5));
    for (uint32_t i = 0; i < 8; ++i) st.push_back(AddPoint(0, Pos(10 + i), 64 + i));
    st.push_back(AddRange(0, Pos(20), Pos(25), 72));
    st.push_back(AddText(1, Pos(3), u"dest", 80));
    st.push_back(AddText(1, Pos(8), std::u16string(62, u'd'), 81));
    st.push_back(AddPoint(1, Pos(4), 82));
    st.push_back(Copy(2, 0));
    st.push_back(Copy(1, 0));
    st.push_back(Build(3));
    st.push_back(Build(3));
    st.push_back(StartTextTrack(0));
    st.push_back(Walk(1, Pos(0), 0, 0));
    st.push_back(Walk(3, Pos(0), 1, 0));
    st.push_back(EndTextTrack(0));
    st.push_back(Clear(1, ANCLEAR_MASK, 0));
    st.push_back(ClearUserData(0));
    for (size_t d = 0; d < 4; ++d) st.push_back(DeInitDoc(d));
    return s;
}

Scenario LargeTable() {
    Scenario s;
    s.name = "large table";
    s.prepare = [](World &w) {
        antk::DocumentBuilder builder;
        for (uint32_t i = 0; i < kLargeTableItems; ++i) builder.item(antk::kItemParagraph);
        w.docs.push_back(builder.build());
    };
    std::vector<Step> &st = s.steps;
    st.push_back(InitDoc(0));
    st.push_back(AddText(0, Pos(150), u"mid", 1));
    // Enough entries for the table to keep a lookup index beside it.
    for (uint32_t i = 0; i < kLargeTableItems; ++i) {
        st.push_back(AddPoint(0, Pos(i), 10 + i, i % 3 == 0 ? AN_TYPE_POINT : AN_TYPE_VALUE));
    }
    st.push_back(NextAnnoTextPos(0, Pos(0)));        // the first search makes the index
    st.push_back(AddText(0, Pos(150), u"more", 2));  // shifts found through the index
    st.push_back(AddText(0, Pos(200), u"far", 3));
    st.push_back(AddRange(0, Pos(100), Pos(220), 4));  // coverage tests through the index
    st.push_back(StartTextTrack(0));
    st.push_back(Walk(0, Pos(0), 0, 0));
    st.push_back(Find(0, ANFIND_AFTER | ANFIND_EQUAL, 3, Pos(1)));
    st.push_back(Clear(0, ANCLEAR_EQUAL, 2));
    st.push_back(NextAnnoTextPos(0, Pos(160)));
    st.push_back(EndTextTrack(0));
    st.push_back(DeInitDoc(0));
    return s;
}

std::vector<Scenario> AllScenarios() {
    return {StylesAndAnnotations(), AnnotationText(), Mapping(), RangeSplitting(),
            CopyingAndBuilding()};
}

}  // namespace sweep
