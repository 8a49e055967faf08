// Several documents worked on at the same time, one per thread, all bound to one
// global style table that nobody changes while they run. The library keeps no state
// of its own beyond a document's, so every thread must see exactly what it sees when
// its document is worked on alone; under ThreadSanitizer (the tsan preset) the run
// also shows that nothing is shared without synchronisation.
#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "anno/anno.h"
#include "anno/toolkit.h"
#include "hosts/platform.h"
#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"
#include "support/table_rules.h"

namespace {

using annotest::Pos;
using annotest::TextPos;

constexpr int kThreads = 4;
constexpr int kRounds = 30;

// A running digest of everything a scenario observed (FNV-1a over 64-bit values).
struct Digest {
    uint64_t value = 1469598103934665603ull;
    void Add(uint64_t v) {
        for (int i = 0; i < 8; ++i) {
            value ^= (v >> (8 * i)) & 0xFF;
            value *= 1099511628211ull;
        }
    }
    void Add(const ANPos &p) {
        Add(p.itemId);
        Add(p.subItemId);
        Add(p.kind);
        Add(p.textIndex);
    }
};

// What one scenario leaves: its digest, the first table rule it saw broken, and how
// much it did (so a scenario that quietly did nothing is noticed).
struct Outcome {
    uint64_t digest = 0;
    std::string broken;
    uint64_t walkedPositions = 0;
    uint64_t notifications = 0;
};

// A document of text items, cut items, skipped items and plain items in three
// chunks, with a document range, shaped by `seed`.
DAHandle MakeDocument(std::mt19937 &rng) {
    antk::DocumentBuilder builder(6);
    uint32_t first = 0;
    for (int i = 0; i < 15; ++i) {
        uint32_t id = 0;
        switch (rng() % 5) {
            case 0:
            case 1:
                id = builder.textItem(
                    std::string_view("lorem ipsum").substr(rng() % 5, 2 + rng() % 4));
                break;
            case 2:
                id = builder.cutItem();
                break;
            case 3:
                id = builder.skippedItem();
                break;
            default:
                id = builder.item(antk::kItemParagraph);
                break;
        }
        if (i == 1) first = id;
    }
    builder.item(antk::kItemRangeEnd, 0x8003000C);
    builder.range(first, 0x8003000C);
    return builder.build();
}

// Content positions in walk order.
std::vector<ANPos> ContentOf(DAHandle doc) {
    std::vector<ANPos> out;
    for (const antk::ItemView &item : antk::items(doc)) {
        if (item.type == antk::kItemText) {
            for (uint32_t c = 0; c < item.charCount; ++c)
                out.push_back(Pos(item.id, item.firstChar + c));
        } else {
            out.push_back(Pos(item.id));
        }
    }
    return out;
}

// The document's whole walk, content and annotation text merged.
std::vector<ANPos> WalkOf(DAHandle doc, const ANPos &first) {
    std::vector<ANPos> out{first};
    ANPos p = first;
    ANPos next{};
    while (out.size() < 4096 && ANNextPos(doc, &p, &next) == 0) {
        out.push_back(next);
        p = next;
    }
    return out;
}

// Adds, tracks, walks, reads text, sends events, finds, maps and clears on one
// document of its own, for `seed`.
Outcome RunScenario(uint32_t seed, ANStyleTable *global) {
    Outcome outcome;
    Digest digest;
    std::mt19937 rng(seed);
    DAHandle doc = MakeDocument(rng);
    annotest::Notifications heard;
    auto check = [&](const char *after) {
        const std::string broken = annotest::DocumentRulesBroken(doc);
        if (!broken.empty() && outcome.broken.empty())
            outcome.broken = std::string(after) + ": " + broken;
    };
    if (ANInit(doc, global, annotest::Notifications::Callback, &heard) != 0) {
        outcome.broken = "ANInit failed";
        antk::destroyDocument(doc);
        return outcome;
    }
    const std::vector<ANPos> content = ContentOf(doc);
    auto any = [&] { return content[rng() % content.size()]; };
    // userData blocks handed to highlights and not yet freed by ANClearUserData.
    std::set<uint64_t> blocks;
    auto clearUserData = [&] {
        std::set<uint64_t> owned;
        for (const annotest::Listed &e : annotest::ListedEntries(doc)) {
            if ((e.flags & ANENTRY_OWNS_USERDATA) != 0 && e.record.userData != 0) {
                owned.insert(e.record.userData);
            }
        }
        digest.Add(ANClearUserData(doc));
        for (uint64_t block : owned) blocks.erase(block);
    };

    for (int round = 0; round < kRounds; ++round) {
        // Every type of annotation; highlights name the shared global styles.
        const uint32_t tag = 1 + rng() % 3;
        const ANPos a = any();
        const ANPos b = any();
        const uint32_t style = rng() % 2 == 0 ? ANSTYLEWORD_NUMBER | (1 + rng() % 5) : rng() & 0xFF;
        const auto block = reinterpret_cast<uint64_t>(HeapAlloc(GetProcessHeap(), 0, 16));
        blocks.insert(block);
        digest.Add(annotest::AddHilite(doc, a, b, tag, style, block, 0x3F, round));
        digest.Add(annotest::AddPoint(doc, any(), tag, round,
                                      rng() % 2 == 0 ? AN_TYPE_POINT : AN_TYPE_VALUE, 0x3F));
        digest.Add(annotest::AddRange(doc, any(), any(), tag));
        const ANPos anchor = any();
        digest.Add(annotest::AddText(doc, anchor, std::u16string(1 + rng() % 4, u'x'), tag));
        digest.Add(annotest::AddPlaceholder(
            doc, TextPos(anchor.itemId, anchor.subItemId, rng() % 2), tag));
        digest.Add(annotest::AddCutMark(doc, any(), tag));
        check("adding");

        // A drawing walk with tracking and annotation text.
        const std::vector<ANPos> walk = WalkOf(doc, content.front());
        outcome.walkedPositions += walk.size();
        ANTrackInfo track{};
        digest.Add(ANStartAnnoTrack(doc, &walk.front(), &track));
        ANAnnoTextTrack text{};
        digest.Add(ANStartAnnoTextTrack(doc, &text));
        for (const ANPos &p : walk) {
            digest.Add(p);
            const uint32_t bits = ANTrackAnno(doc, &p, &track);
            digest.Add(bits);
            if (bits != 0) {
                digest.Add(track.color1Set | track.color2Set << 1 | track.attrSet << 2);
                if (track.color1Set != 0) digest.Add(track.color1);
                if (track.color2Set != 0) digest.Add(track.color2);
                if (track.attrSet != 0) digest.Add(track.attr1 | track.attr2 << 16);
                digest.Add(track.value);
            }
            if (p.kind == ANPOS_ANNOTEXT) {
                uint16_t unit = 0;
                digest.Add(ANGetAnnoText(doc, &text, &p, &unit));
                digest.Add(unit);
            }
        }
        ANEndAnnoTrack(doc, &track);
        ANEndAnnoTextTrack(doc, &text);

        // Events where the walk's tracking stands, and searches.
        const ANPos at = walk[rng() % walk.size()];
        ANTrackInfo cursor{};
        const uint16_t entry =
            ANStartAnnoTrack(doc, &at, &cursor) == ANTRACK_ACTIVE ? cursor.cursor : AN_NONE;
        digest.Add(ANAnnoEvent(doc, ANEVENT_MOVE, entry, &at));
        digest.Add(ANAnnoEvent(doc, ANEVENT_CLICK1, entry, &at));
        for (uint16_t kind = ANFIND_FIRST; kind <= ANFIND_AT; ++kind) {
            ANFindRecord find{};
            find.size = ANFINDRECORD_SIZE;
            find.mode = static_cast<uint16_t>(kind | ANFIND_MASK);
            find.tag = tag;
            find.key = at;
            digest.Add(ANFindAnno(doc, 0, &find));
            digest.Add(find.foundTag);
            digest.Add(find.foundStart);
            digest.Add(find.foundEnd);
        }

        // Mapping reads the document's content through a content document of its own.
        ANMapRecord map{ANMAPRECORD_SIZE, ANMAP_POS_TO_ORDINAL, any(), 0};
        digest.Add(ANMapPosition(doc, &map));
        digest.Add(map.ordinal);
        map.flags = ANMAP_ORDINAL_TO_POS;
        digest.Add(ANMapPosition(doc, &map));
        digest.Add(map.pos);

        // Styles: lookups through the document reach the shared table.
        ANHiliteStyle found{};
        digest.Add(ANGetHiliteStyle(doc, 1 + rng() % 6, &found));
        digest.Add(found.color1);
        check("walking");

        if (round % 3 == 2) {
            digest.Add(ANClearAnnos(doc, ANCLEAR_EQUAL, tag));
            check("clearing");
            clearUserData();
        }
    }
    outcome.notifications = heard.calls.size();
    for (const annotest::Notification &n : heard.calls) {
        digest.Add(n.code);
        digest.Add(n.detail);
    }
    // Blocks still held by highlights go through the library; those of highlights
    // that clears removed are the caller's to free.
    clearUserData();
    ANDeInit(doc);
    for (uint64_t block : blocks) HeapFree(GetProcessHeap(), 0, reinterpret_cast<void *>(block));
    antk::destroyDocument(doc);
    outcome.digest = digest.value;
    return outcome;
}

class ThreadedDocuments : public annotest::LeakCheckedTest {
 protected:
    void SetUp() override {
        LeakCheckedTest::SetUp();
        ASSERT_EQ(ANInitGlobalHiliteStyles(&global_), AN_OK);
        for (uint32_t id = 1; id <= 4; ++id) {
            const ANHiliteStyle s{ANHILITESTYLE_SIZE,
                                  id,
                                  id,
                                  0x010101 * id,
                                  0x020202 * id,
                                  static_cast<uint16_t>(id),
                                  static_cast<uint16_t>(10 * id),
                                  0};
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
    // Alone, one after the other: what each scenario must see.
    std::vector<Outcome> alone;
    for (int t = 0; t < kThreads; ++t) alone.push_back(RunScenario(1000 + t, global_));

    // All at once, twice over, each thread with its own document.
    for (int pass = 0; pass < 2; ++pass) {
        std::vector<Outcome> together(kThreads);
        std::vector<std::thread> threads;
        for (int t = 0; t < kThreads; ++t) {
            threads.emplace_back([&, t] { together[t] = RunScenario(1000 + t, global_); });
        }
        for (std::thread &thread : threads) thread.join();
        for (int t = 0; t < kThreads; ++t) {
            SCOPED_TRACE("thread " + std::to_string(t) + ", pass " + std::to_string(pass));
            EXPECT_EQ(together[t].broken, "");
            EXPECT_EQ(together[t].digest, alone[t].digest);
            EXPECT_EQ(together[t].notifications, alone[t].notifications);
        }
    }
    for (int t = 0; t < kThreads; ++t) {
        EXPECT_EQ(alone[t].broken, "");
        EXPECT_GT(alone[t].walkedPositions, 100u) << "the scenario hardly walked";
        EXPECT_GT(alone[t].notifications, 50u) << "the scenario hardly changed anything";
    }
    EXPECT_NE(alone[0].digest, alone[1].digest) << "the scenarios should differ";
    EXPECT_EQ(antk::openSecondaryDocuments(), 0);
    EXPECT_EQ(antk::openContents(), 0);
}

// Tracking records and text tracks belong to their callers: several walks over one
// document at once, each with its own records, only read it (the document itself
// is never changed while they run, as the library requires).
TEST_F(ThreadedDocuments, ConcurrentReadersOfOneUnchangingDocumentAgree) {
    std::mt19937 rng(77);
    annotest::Doc doc(MakeDocument(rng));
    ASSERT_EQ(ANInit(doc, global_, nullptr, nullptr), AN_OK);
    const std::vector<ANPos> content = ContentOf(doc);
    for (size_t i = 0; i + 2 < content.size(); i += 3) {
        ASSERT_EQ(annotest::AddHilite(doc, content[i], content[i + 2], 1,
                                      ANSTYLEWORD_NUMBER | (1 + i % 4)),
                  AN_OK);
        ASSERT_EQ(annotest::AddText(doc, content[i + 1], u"ab"), AN_OK);
        ASSERT_EQ(annotest::AddPoint(doc, content[i + 2], 1, i), AN_OK);
    }
    auto read = [&] {
        Digest digest;
        const std::vector<ANPos> walk = WalkOf(doc, content.front());
        ANTrackInfo track{};
        ANAnnoTextTrack text{};
        digest.Add(ANStartAnnoTrack(doc, &walk.front(), &track));
        digest.Add(ANStartAnnoTextTrack(doc, &text));
        for (const ANPos &p : walk) {
            digest.Add(ANTrackAnno(doc, &p, &track));
            digest.Add(track.color1);
            uint16_t unit = 0;
            digest.Add(ANGetAnnoText(doc, &text, &p, &unit));
            digest.Add(unit);
        }
        ANEndAnnoTextTrack(doc, &text);
        return digest.value;
    };
    const uint64_t expected = read();
    std::vector<uint64_t> got(kThreads);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < 20; ++i) got[t] = read();
        });
    }
    for (std::thread &thread : threads) thread.join();
    for (int t = 0; t < kThreads; ++t) EXPECT_EQ(got[t], expected) << "thread " << t;
}

}  // namespace
