// Documents worked on at once, one per thread, bound to one global style table nobody changes:
// each thread must observe exactly what the same work shows alone (under ThreadSanitizer, too).
#include <future>
#include <random>
#include "support/fixture.h"
#include "support/table_view.h"

namespace {

using namespace annotest;  // NOLINT(google-build-using-namespace)
using ThreadedDocuments = LeakCheckedTest;
using Seen = std::vector<uint64_t>;  // what a thread observed, in order
uint64_t Key(ANPos p) { return std::hash<std::string_view>{}({(const char *)&p, sizeof p}); }
// On a document of its own (text, plain, cut and skipped items in chunks of six), 30 rounds: adds
// all types (highlights naming the shared styles, with caller blocks), walks tracking and reading
// text, sends events, finds, maps, looks styles up and clears; the table rules hold.
Seen Work(uint32_t seed, ANStyleTable *global) {
    Seen seen;
    auto d = [&](std::initializer_list<uint64_t> vs) { seen.insert(seen.end(), vs); };
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
    for (const antk::ItemView &it : antk::items(doc))
        for (uint32_t c = 0; c < std::max(it.charCount, 1u); ++c)
            content.push_back(it.charCount ? Pos(it.id, it.firstChar + c) : Pos(it.id));
    auto any = [&] { return content[rng() % content.size()]; };
    d({ANInit(doc, global, Notifications::Callback, &heard)});
    for (uint32_t round = 0; round < 30; ++round) {
        const uint32_t tag = 1 + rng() % 3,
                       word = rng() % 2 ? ANSTYLEWORD_NUMBER | (1 + rng() % 5) : rng() & 0xFF;
        const uint64_t block = NewHeapBlock(16),  // freed by ANClearUserData once added
            added = AddHilite(doc, any(), any(), tag, word, block, 0x3F, round);
        if (added != AN_OK) FreeHeapBlock(block);
        const ANPos a = any(), at = rng() % 4 ? any() : TextPos(a.itemId, a.subItemId, rng() % 3);
        d({added, AddPoint(doc, any(), tag, round, rng() % 2 ? AN_TYPE_POINT : AN_TYPE_VALUE, 0x3F),
           AddRange(doc, any(), any(), tag),
           AddText(doc, a, std::u16string(1 + rng() % 4, u'x'), tag),
           AddMark(doc, 6, TextPos(a.itemId, a.subItemId, rng() % 2), tag),
           AddMark(doc, 7, any(), tag)});
        auto [t, tx, st, u] = std::tuple<ANTrackInfo, ANAnnoTextTrack, ANHiliteStyle, uint16_t>();
        d({ANStartAnnoTrack(doc, &content.front(), &t), ANStartAnnoTextTrack(doc, &tx)});
        for (ANPos p = content.front(), next; ANNextPos(doc, &p, &next) == AN_OK; p = next) {
            d({Key(p), ANTrackAnno(doc, &p, &t), t.color1Set, t.color1, t.color2Set, t.color2,
               t.attrSet, t.attr1, t.attr2, t.value});
            if (p.kind == ANPOS_ANNOTEXT) d({ANGetAnnoText(doc, &tx, &p, &u), u});
        }
        d({ANEndAnnoTrack(doc, &t), ANEndAnnoTextTrack(doc, &tx), ANStartAnnoTrack(doc, &at, &t)});
        for (uint32_t e : {ANEVENT_MOVE, ANEVENT_CLICK1}) d({ANAnnoEvent(doc, e, t.cursor, &at)});
        ANFindRecord f{72, uint16_t(ANFIND_MASK + 1 + round % 6), 0, tag, at, 0, {}, {}, 0};
        ANMapRecord map{ANMAPRECORD_SIZE, ANMAP_POS_TO_ORDINAL, any(), 0};  // reads the content
        d({ANFindAnno(doc, 0, &f), f.foundTag, Key(f.foundStart), Key(f.foundEnd),
           ANMapPosition(doc, &map), map.ordinal,
           (map.flags = ANMAP_ORDINAL_TO_POS, ANMapPosition(doc, &map)), Key(map.pos),
           ANGetHiliteStyle(doc, 1 + rng() % 6, &st) /* to the shared table */, st.color1});
        if (round % 3 == 2) d({ANClearUserData(doc), ANClearAnnos(doc, ANCLEAR_EQUAL, tag)});
        EXPECT_EQ(DocumentRulesBroken(doc), "") << "seed " << seed << ", round " << round;
    }
    for (const Notification &n : heard.calls) d({n.code, n.detail});
    EXPECT_GT(heard.calls.size(), 50u) << "seed " << seed << " hardly changed anything";
    return seen;  // the last round freed the caller blocks
}
TEST_F(ThreadedDocuments, EachThreadSeesWhatItsDocumentShowsAlone) {
    ANStyleTable *global = nullptr;
    ASSERT_EQ(ANInitGlobalHiliteStyles(&global), AN_OK);
    ANHiliteStyle s{ANHILITESTYLE_SIZE, 1, 1, 0x10101u, 0x20202u, 1, 1, 0};
    for (; s.styleId <= 4; ++s.styleId, s.flags = s.attr1 = s.attr2 = s.styleId, s.color1 *= 3)
        ASSERT_EQ(ANAddGlobalHiliteStyle(global, &s), AN_OK);
    std::vector<std::future<Seen>> together;  // each seed's work twice at once, then alone
    for (uint32_t t = 0; t < 8; ++t)
        together.push_back(std::async(std::launch::async, Work, 1000 + t % 4, global));
    for (auto &f : together) f.wait();
    for (uint32_t t = 0; t < 8; ++t) EXPECT_TRUE(together[t].get() == Work(1000 + t % 4, global));
    EXPECT_TRUE(Work(1000, global) != Work(1001, global)) << "the threads' work should differ";
    EXPECT_EQ(antk::openSecondaryDocuments() + antk::openContents(), 0);
    EXPECT_EQ(ANDeInitGlobalHiliteStyles(global), AN_OK);
}

}  // namespace
