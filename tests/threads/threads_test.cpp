// Documents worked on at once, one per thread, all bound to one global style table nobody
// changes meanwhile: the library keeps no state beyond a document's, so each thread must
// observe exactly what the same work shows alone (and, under ThreadSanitizer, share nothing).
#include <random>
#include <thread>

#include "support/fixture.h"
#include "support/table_view.h"

namespace {

using namespace annotest;  // NOLINT(google-build-using-namespace)
using ThreadedDocuments = LeakCheckedTest;
constexpr int kThreads = 4;

// A digest of what a thread observed (the values of a braced list are read in order).
struct Digest {
    uint64_t value = 1469598103934665603ull, heard = 0;
    std::string broken;
    void Add(std::initializer_list<uint64_t> vs) {
        for (uint64_t v : vs) value = ((value ^ v) * 1099511628211ull) ^ (value >> 29);
    }
};
uint64_t Key(const ANPos &p) {
    return (uint64_t{p.itemId} << 32 | p.subItemId) * 31 + (uint64_t{p.kind} << 32 | p.textIndex);
}

// On a document of its own (text, plain, cut and skipped items in chunks of six), thirty
// rounds: adds every type (highlights naming the shared styles, with caller blocks), walks
// tracking and reading text, sends events, finds, maps, looks styles up and clears.
Digest Work(uint32_t seed, ANStyleTable *global) {
    Digest d;
    std::mt19937 rng(seed);
    antk::DocumentBuilder b(6);
    for (char k : std::string_view("tptcstpttsctpt"))
        k == 't'   ? b.textItem(std::string_view("lorem ipsum").substr(rng() % 5, 2 + rng() % 4))
        : k == 'c' ? b.cutItem()
        : k == 's' ? b.skippedItem()
                   : b.item(antk::kItemParagraph);
    Notifications heard;
    Doc doc(b.build());
    std::vector<ANPos> content;  // characters of text items, other items themselves
    for (const antk::ItemView &it : antk::items(doc)) {
        if (it.charCount == 0) content.push_back(Pos(it.id));
        for (uint32_t c = 0; c < it.charCount; ++c) content.push_back(Pos(it.id, it.firstChar + c));
    }
    auto any = [&] { return content[rng() % content.size()]; };
    auto check = [&] { d.broken += d.broken.empty() ? DocumentRulesBroken(doc) : ""; };
    d.broken = ANInit(doc, global, Notifications::Callback, &heard) ? "ANInit failed" : "";
    for (uint32_t round = 0; round < 30; ++round) {
        const uint32_t tag = 1 + rng() % 3,
                       style = rng() % 2 ? ANSTYLEWORD_NUMBER | (1 + rng() % 5) : rng() & 0xFF;
        const uint64_t block = NewHeapBlock(16);  // freed by ANClearUserData once added
        const uint32_t added = AddHilite(doc, any(), any(), tag, style, block, 0x3F, round);
        if (added != AN_OK) FreeHeapBlock(block);
        const ANPos a = any(), at = rng() % 4 ? any() : TextPos(a.itemId, a.subItemId, rng() % 3);
        d.Add({added,
               AddPoint(doc, any(), tag, round, rng() % 2 ? AN_TYPE_POINT : AN_TYPE_VALUE, 0x3F),
               AddRange(doc, any(), any(), tag),
               AddText(doc, a, std::u16string(1 + rng() % 4, u'x'), tag),
               AddMark(doc, AN_TYPE_PLACEHOLDER, TextPos(a.itemId, a.subItemId, rng() % 2), tag),
               AddMark(doc, AN_TYPE_CUTMARK, any(), tag)});
        check();
        ANTrackInfo t{};
        ANAnnoTextTrack text{};
        ANPos p = content.front(), next{};
        d.Add({ANStartAnnoTrack(doc, &p, &t), ANStartAnnoTextTrack(doc, &text)});
        for (uint16_t unit = 0; ANNextPos(doc, &p, &next) == AN_OK; p = next, unit = 0) {
            d.Add({Key(p), ANTrackAnno(doc, &p, &t), t.color1Set, t.color1, t.color2Set, t.color2,
                   t.attrSet, t.attr1, t.attr2, t.value});
            if (p.kind == ANPOS_ANNOTEXT) d.Add({ANGetAnnoText(doc, &text, &p, &unit), unit});
        }
        d.Add({ANEndAnnoTrack(doc, &t), ANEndAnnoTextTrack(doc, &text)});
        const uint16_t entry =
            ANStartAnnoTrack(doc, &at, &t) == ANTRACK_ACTIVE ? t.cursor : AN_NONE;
        d.Add({ANAnnoEvent(doc, ANEVENT_MOVE, entry, &at),
               ANAnnoEvent(doc, ANEVENT_CLICK1, entry, &at)});
        for (uint16_t k = ANFIND_FIRST; k <= ANFIND_AT; ++k) {
            ANFindRecord f{ANFINDRECORD_SIZE, uint16_t(k | ANFIND_MASK), 0, tag, at, 0, {}, {}, 0};
            d.Add({ANFindAnno(doc, 0, &f), f.foundTag, Key(f.foundStart), Key(f.foundEnd)});
        }
        ANMapRecord map{ANMAPRECORD_SIZE, ANMAP_POS_TO_ORDINAL, any(), 0};  // reads the content
        d.Add({ANMapPosition(doc, &map), map.ordinal,
               (map.flags = ANMAP_ORDINAL_TO_POS, ANMapPosition(doc, &map)), Key(map.pos)});
        ANHiliteStyle found{};  // through the document to the shared table
        d.Add({ANGetHiliteStyle(doc, 1 + rng() % 6, &found), found.color1});
        if (round % 3 == 2) d.Add({ANClearUserData(doc), ANClearAnnos(doc, ANCLEAR_EQUAL, tag)});
        check();
    }
    for (const Notification &n : heard.calls) d.Add({n.code, n.detail}), ++d.heard;
    d.Add({ANClearUserData(doc)});
    return d;
}

TEST_F(ThreadedDocuments, EachThreadSeesWhatItsDocumentShowsAlone) {
    ANStyleTable *global = nullptr;
    ASSERT_EQ(ANInitGlobalHiliteStyles(&global), AN_OK);
    for (uint16_t id = 1; id <= 4; ++id) {
        const ANHiliteStyle s{ANHILITESTYLE_SIZE, id, id, 0x10101u * id, 0x20202u * id, id, id, 0};
        ASSERT_EQ(ANAddGlobalHiliteStyle(global, &s), AN_OK);
    }
    std::vector<Digest> alone, together(kThreads);
    for (int t = 0; t < kThreads; ++t) alone.push_back(Work(1000 + t, global));
    for (int pass = 0; pass < 2; ++pass) {
        std::vector<std::thread> threads(kThreads);
        for (int t = 0; t < kThreads; ++t)
            threads[t] = std::thread([&, t] { together[t] = Work(1000 + t, global); });
        for (std::thread &thread : threads) thread.join();
        for (int t = 0; t < kThreads; ++t) {
            EXPECT_EQ(together[t].broken + alone[t].broken, "") << "thread " << t;
            EXPECT_EQ(together[t].value, alone[t].value) << "thread " << t << ", pass " << pass;
            EXPECT_GT(alone[t].heard, 50u) << "thread " << t << " hardly changed anything";
        }
    }
    EXPECT_NE(alone[0].value, alone[1].value) << "the threads' work should differ";
    EXPECT_EQ(antk::openSecondaryDocuments() + antk::openContents(), 0);
    EXPECT_EQ(ANDeInitGlobalHiliteStyles(global), AN_OK);
}

}  // namespace
