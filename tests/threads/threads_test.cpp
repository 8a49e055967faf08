// Several documents worked on at once, one per thread, all bound to one global style table
// nobody changes while they run. The library keeps no state beyond a document's, so each
// thread must observe exactly what the same work shows alone; under ThreadSanitizer the
// run also shows that nothing is shared without synchronisation.
#include <random>
#include <set>
#include <thread>

#include "support/fixture.h"
#include "support/table_view.h"

namespace {

using annotest::Pos;

constexpr int kThreads = 4;

// FNV-1a over everything a scenario observed, plus how much it did.
struct Digest {
    uint64_t value = 1469598103934665603ull, walked = 0, heard = 0;
    std::string broken;
    void Add(uint64_t v) {
        for (int i = 0; i < 8; ++i) value = (value ^ ((v >> (8 * i)) & 0xFF)) * 1099511628211ull;
    }
    void Add(const ANPos &p) { Add(uint64_t{p.itemId} << 32 | p.subItemId), Add(p.kind), Add(p.textIndex); }
};

// Text, cut, skipped and plain items over chunks of six, with one document range.
DAHandle MakeDocument(std::mt19937 &rng, std::vector<ANPos> &content) {
    antk::DocumentBuilder b(6);
    uint32_t first = 0;
    for (int i = 0; i < 15; ++i) {
        const uint32_t k = rng() % 5, id = k < 2    ? b.textItem(std::string_view("lorem ipsum")
                                                                     .substr(rng() % 5, 2 + rng() % 4))
                                           : k == 2 ? b.cutItem()
                                           : k == 3 ? b.skippedItem()
                                                    : b.item(antk::kItemParagraph);
        if (i == 1) first = id;
    }
    b.item(antk::kItemRangeEnd, 0x8003000C);
    b.range(first, 0x8003000C);
    DAHandle doc = b.build();
    for (const antk::ItemView &item : antk::items(doc)) {
        content.push_back(Pos(item.id));
        for (uint32_t c = 0; c < item.charCount; ++c) content.back() = Pos(item.id, item.firstChar + c), content.push_back(content.back());
        if (item.charCount != 0) content.pop_back();
    }
    return doc;
}

// A drawing walk from the first content position: tracking with its styles, and text.
void Walk(DAHandle doc, const ANPos &first, Digest &d) {
    ANTrackInfo track{};
    ANAnnoTextTrack text{};
    d.Add(ANStartAnnoTrack(doc, &first, &track));
    d.Add(ANStartAnnoTextTrack(doc, &text));
    ANPos p = first, next{};
    for (int n = 0; n < 4096; ++n, p = next, ++d.walked) {
        d.Add(p);
        const uint32_t bits = ANTrackAnno(doc, &p, &track);
        d.Add(bits);
        if (bits != 0) d.Add(track.color1Set ? track.color1 : 1), d.Add(track.color2Set ? track.color2 : 2), d.Add(track.attrSet ? track.attr1 | track.attr2 << 16 : 3), d.Add(track.value);
        uint16_t unit = 0;
        if (p.kind == ANPOS_ANNOTEXT) d.Add(ANGetAnnoText(doc, &text, &p, &unit)), d.Add(unit);
        if (ANNextPos(doc, &p, &next) != AN_OK) break;
    }
    ANEndAnnoTrack(doc, &track);
    ANEndAnnoTextTrack(doc, &text);
}

// Adds every type, walks, sends events, finds, maps, looks styles up and clears, 30 rounds.
Digest Scenario(uint32_t seed, ANStyleTable *global) {
    Digest d;
    std::mt19937 rng(seed);
    std::vector<ANPos> content;
    annotest::Doc doc(MakeDocument(rng, content));
    annotest::Notifications heard;
    if (ANInit(doc, global, annotest::Notifications::Callback, &heard) != AN_OK) return d.broken = "ANInit", d;
    auto any = [&] { return content[rng() % content.size()]; };
    auto check = [&](const char *after) {
        if (d.broken.empty() && !annotest::DocumentRulesBroken(doc).empty()) d.broken = after;
    };
    std::set<uint64_t> blocks;  // caller blocks not yet freed by ANClearUserData
    auto clearUserData = [&] {
        for (const annotest::Entry &e : annotest::ListEntries(doc))
            if (e.ownsUserData) blocks.erase(e.record.userData);
        d.Add(ANClearUserData(doc));
    };
    for (int round = 0; round < 30; ++round) {
        const uint32_t tag = 1 + rng() % 3;
        const ANPos a = any(), b = any(), anchor = any();
        const uint32_t style = rng() % 2 ? ANSTYLEWORD_NUMBER | (1 + rng() % 5) : rng() & 0xFF;
        const uint64_t block = *blocks.insert(annotest::NewHeapBlock(16)).first;
        d.Add(annotest::AddHilite(doc, a, b, tag, style, block, 0x3F, round));
        d.Add(annotest::AddPoint(doc, any(), tag, round, rng() % 2 ? AN_TYPE_POINT : AN_TYPE_VALUE, 0x3F));
        d.Add(annotest::AddRange(doc, any(), any(), tag));
        d.Add(annotest::AddText(doc, anchor, std::u16string(1 + rng() % 4, u'x'), tag));
        d.Add(annotest::AddMark(doc, AN_TYPE_PLACEHOLDER, annotest::TextPos(anchor.itemId, anchor.subItemId, rng() % 2), tag));
        d.Add(annotest::AddMark(doc, AN_TYPE_CUTMARK, any(), tag));
        check("adding");
        Walk(doc, content.front(), d);
        const ANPos at = any();
        ANTrackInfo cursor{};
        const uint16_t entry = ANStartAnnoTrack(doc, &at, &cursor) == ANTRACK_ACTIVE ? cursor.cursor : AN_NONE;
        d.Add(ANAnnoEvent(doc, ANEVENT_MOVE, entry, &at));
        d.Add(ANAnnoEvent(doc, ANEVENT_CLICK1, entry, &at));
        for (uint16_t kind = ANFIND_FIRST; kind <= ANFIND_AT; ++kind) {
            ANFindRecord f{ANFINDRECORD_SIZE, static_cast<uint16_t>(kind | ANFIND_MASK), 0, tag, at, 0, {}, {}, 0};
            d.Add(ANFindAnno(doc, 0, &f)), d.Add(f.foundTag), d.Add(f.foundStart), d.Add(f.foundEnd);
        }
        ANMapRecord map{ANMAPRECORD_SIZE, ANMAP_POS_TO_ORDINAL, any(), 0};  // own content document
        d.Add(ANMapPosition(doc, &map)), d.Add(map.ordinal);
        map.flags = ANMAP_ORDINAL_TO_POS;
        d.Add(ANMapPosition(doc, &map)), d.Add(map.pos);
        ANHiliteStyle found{};  // through the document to the shared table
        d.Add(ANGetHiliteStyle(doc, 1 + rng() % 6, &found)), d.Add(found.color1);
        check("walking");
        if (round % 3 == 2) d.Add(ANClearAnnos(doc, ANCLEAR_EQUAL, tag)), check("clearing"), clearUserData();
    }
    for (const annotest::Notification &n : heard.calls) d.Add(n.code), d.Add(n.detail), ++d.heard;
    clearUserData();  // blocks of highlights that clears removed stay the caller's
    for (uint64_t block : blocks) annotest::FreeHeapBlock(block);
    return d;
}

class ThreadedDocuments : public annotest::LeakCheckedTest {
 protected:
    void SetUp() override {
        LeakCheckedTest::SetUp();
        ASSERT_EQ(ANInitGlobalHiliteStyles(&global_), AN_OK);
        for (uint16_t id = 1; id <= 4; ++id) {
            const ANHiliteStyle s{ANHILITESTYLE_SIZE, id, id, 0x010101u * id, 0x020202u * id, id, uint16_t(10 * id), 0};
            ASSERT_EQ(ANAddGlobalHiliteStyle(global_, &s), AN_OK);
        }
    }
    void TearDown() override {
        EXPECT_EQ(ANDeInitGlobalHiliteStyles(global_), AN_OK);
        LeakCheckedTest::TearDown();
    }
    ANStyleTable *global_ = nullptr;
};

TEST_F(ThreadedDocuments, EachThreadSeesWhatItsDocumentShowsAlone) {
    std::vector<Digest> alone;
    for (int t = 0; t < kThreads; ++t) alone.push_back(Scenario(1000 + t, global_));
    for (int pass = 0; pass < 2; ++pass) {
        std::vector<Digest> together(kThreads);
        std::vector<std::thread> threads;
        for (int t = 0; t < kThreads; ++t) threads.emplace_back([&, t] { together[t] = Scenario(1000 + t, global_); });
        for (std::thread &thread : threads) thread.join();
        for (int t = 0; t < kThreads; ++t) {
            EXPECT_EQ(together[t].broken, "") << "thread " << t;
            EXPECT_EQ(together[t].value, alone[t].value) << "thread " << t << ", pass " << pass;
        }
    }
    for (const Digest &d : alone) {
        EXPECT_EQ(d.broken, "");
        EXPECT_GT(d.walked, 100u) << "the scenario hardly walked";
        EXPECT_GT(d.heard, 50u) << "the scenario hardly changed anything";
    }
    EXPECT_NE(alone[0].value, alone[1].value) << "the scenarios should differ";
    EXPECT_EQ(antk::openSecondaryDocuments(), 0);
    EXPECT_EQ(antk::openContents(), 0);
}

// Tracking records and text tracks are the callers': walks over one unchanging document
// on several threads at once, each with its own records, agree with one walk alone.
TEST_F(ThreadedDocuments, ConcurrentReadersOfOneUnchangingDocumentAgree) {
    std::mt19937 rng(77);
    std::vector<ANPos> c;
    annotest::Doc doc(MakeDocument(rng, c));
    ASSERT_EQ(ANInit(doc, global_, nullptr, nullptr), AN_OK);
    for (size_t i = 0; i + 2 < c.size(); i += 3) {
        ASSERT_EQ(annotest::AddHilite(doc, c[i], c[i + 2], 1, ANSTYLEWORD_NUMBER | (1 + i % 4)), AN_OK);
        ASSERT_EQ(annotest::AddText(doc, c[i + 1], u"ab"), AN_OK);
        ASSERT_EQ(annotest::AddPoint(doc, c[i + 2], 1, i), AN_OK);
    }
    Digest expected;
    Walk(doc, c.front(), expected);
    std::vector<Digest> got(kThreads);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) threads.emplace_back([&, t] { for (int i = 0; i < 20; ++i) got[t] = {}, Walk(doc, c.front(), got[t]); });
    for (std::thread &thread : threads) thread.join();
    for (int t = 0; t < kThreads; ++t) EXPECT_EQ(got[t].value, expected.value) << "thread " << t;
}

}  // namespace
