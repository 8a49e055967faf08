// Whole tracking walks over generated annotation sets added through ANAddAnno,
// checked position by position against a brute-force reading of which entries cover
// each position.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <vector>

#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"
#include "tracking/walk_check.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;

// A document of eight items, about a third of them text items of one to three
// characters, in chunks of up to six items.
DAHandle MakeWalkDocument(std::mt19937 &rng) {
    antk::DocumentBuilder builder(6);
    for (int i = 0; i < 8; ++i) {
        if (rng() % 3 == 0) {
            builder.textItem(std::string_view("abc").substr(0, 1 + i % 3));
        } else {
            builder.item(antk::kItemParagraph);
        }
    }
    return builder.build();
}

uint32_t RandomStyleWord(std::mt19937 &rng) {
    const uint32_t bits = rng();
    if (bits % 3 == 0) return ANSTYLEWORD_NUMBER | (bits & 0xBFFF0000u) | (1 + (bits >> 8) % 6);
    return bits & ~ANSTYLEWORD_NUMBER;
}

class TrackWalkTest : public annotest::LeakCheckedTest {
 protected:
    void SetUp() override {
        LeakCheckedTest::SetUp();
        ASSERT_EQ(ANInitGlobalHiliteStyles(&global_), AN_OK);
        for (uint32_t id = 1; id <= 4; ++id) {
            const ANHiliteStyle s{ANHILITESTYLE_SIZE,        id, id, 0x100 * id, 0x10000 * id,
                                  static_cast<uint16_t>(id), 0,  0};
            ASSERT_EQ(ANAddGlobalHiliteStyle(global_, &s), AN_OK);
        }
    }
    void TearDown() override {
        ANDeInitGlobalHiliteStyles(global_);
        LeakCheckedTest::TearDown();
    }

    // Styles 3 to 6 in the document's own table: 3 and 4 shadow global ones, 5 and 6
    // exist only here.
    void AddDocumentStyles(DAHandle doc) {
        for (uint32_t id = 3; id <= 6; ++id) {
            const ANHiliteStyle s{ANHILITESTYLE_SIZE, id, 7 - id, 0xABC * id, 0xDEF * id, 9, 8, 0};
            ASSERT_EQ(ANAddHiliteStyle(doc, &s), AN_OK);
        }
    }

    ANStyleTable *global_ = nullptr;
};

// Content positions of a document, in order: each item, then its characters.
std::vector<ANPos> ContentPositions(DAHandle doc) {
    std::vector<ANPos> out;
    for (const antk::ItemView &item : antk::items(doc)) {
        out.push_back(Pos(item.id));
        for (uint32_t c = 0; c < item.charCount; ++c)
            out.push_back(Pos(item.id, item.firstChar + c));
    }
    return out;
}

// Every position a walk may meet: `textPerAnchor` annotation-text positions before each
// content position, in order, with anchors that share their text counted once.
std::vector<ANPos> WithTextPositions(const std::vector<ANPos> &content, uint32_t textPerAnchor) {
    std::vector<ANPos> out;
    for (const ANPos &c : content) {
        for (uint32_t k = 0; k < textPerAnchor; ++k)
            out.push_back(TextPos(c.itemId, c.subItemId, k));
        out.push_back(c);
    }
    auto before = [](const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b) < 0; };
    auto same = [](const ANPos &a, const ANPos &b) { return ANCompPos(&a, &b) == 0; };
    std::stable_sort(out.begin(), out.end(), before);
    out.erase(std::unique(out.begin(), out.end(), same), out.end());
    return out;
}

// A place to add at: a content position, or now and then a place inside the
// annotation text already at one.
ANPos RandomPlace(std::mt19937 &rng, DAHandle doc, const std::vector<ANPos> &content) {
    const ANPos p = content[rng() % content.size()];
    if (rng() % 3 != 0) return p;
    const size_t units = annotest::AnchorText(doc, p).size();
    if (units == 0) return p;
    return TextPos(p.itemId, p.subItemId, static_cast<uint32_t>(rng() % (units + 1)));
}

// The other end of a range: never its start, since text added where an empty range
// sits would move its end in front of its start.
ANPos OtherPlace(std::mt19937 &rng, DAHandle doc, const std::vector<ANPos> &content,
                 const ANPos &start) {
    for (;;) {
        const ANPos p = RandomPlace(rng, doc, content);
        if (ANCompPos(&p, &start) != 0) return p;
    }
}

void AddRandomAnnotations(std::mt19937 &rng, DAHandle doc, const std::vector<ANPos> &content,
                          int n) {
    for (int i = 0; i < n; ++i) {
        const uint64_t user = 0x1000 + i;
        const ANPos a = RandomPlace(rng, doc, content);
        uint32_t rc = AN_OK;
        const uint32_t kind = rng() % 8;
        const bool textType = kind == 5 || kind == 6;
        switch (kind) {
            case 0:
            case 1:
                rc = annotest::AddHilite(doc, a, OtherPlace(rng, doc, content, a), 1,
                                         RandomStyleWord(rng), user, 0, 0x3000 + i);
                break;
            case 2:
                rc = annotest::AddPoint(doc, a, 1, 0x2000 + i, AN_TYPE_POINT, 0, user);
                break;
            case 3:
                rc = annotest::AddPoint(doc, a, 1, 0x2000 + i, AN_TYPE_VALUE, 0, user);
                break;
            case 4:
                rc = annotest::AddRange(doc, a, OtherPlace(rng, doc, content, a), 1, user);
                break;
            case 5:
                rc = annotest::AddText(doc, a, u"pq" + std::u16string(rng() % 3, u'r'), 1, user);
                break;
            case 6:
                rc = annotest::AddPlaceholder(doc, a, 1, user);
                break;
            default:
                rc = annotest::AddCutMark(doc, a, 1, user);
                break;
        }
        // Adding refuses text at an index that is not inside the anchor's text.
        const bool refusedInText = rc == AN_ERR_BADARG && a.kind == ANPOS_ANNOTEXT && textType;
        ASSERT_TRUE(rc == AN_OK || refusedInText) << "annotation " << i << ": " << rc;
    }
}

TEST_F(TrackWalkTest, AddedAnnotationsAgreeWithBruteForceAtEveryPosition) {
    int fullCalls = 0, reports = 0;
    for (uint32_t seed = 1; seed <= 300; ++seed) {
        SCOPED_TRACE("seed " + std::to_string(seed));
        std::mt19937 rng(seed);
        Doc doc(MakeWalkDocument(rng));
        ASSERT_EQ(ANInit(doc, global_, nullptr, nullptr), AN_OK);
        AddDocumentStyles(doc);
        const std::vector<ANPos> content = ContentPositions(doc);
        // Character id 0 shares its annotation-text anchor with its item, and text
        // inserted there would move a range's end in front of the item; adding keeps
        // away from it (the walk still visits it).
        std::vector<ANPos> places;
        for (const ANPos &c : content) {
            if (c.subItemId != 0) places.push_back(c);
        }
        AddRandomAnnotations(rng, doc, places, 1 + rng() % 25);
        ASSERT_TRUE(annotest::TableInvariantsHold(doc));

        uint32_t textUnits = 1;
        for (const annotest::Listed &e : annotest::ListedEntries(doc)) {
            for (const ANPos &q : {e.record.start, e.record.end}) {
                if (q.kind == ANPOS_ANNOTEXT) textUnits = std::max(textUnits, q.textIndex + 2);
            }
            textUnits =
                std::max<uint32_t>(textUnits, annotest::AnchorText(doc, e.record.start).size() + 1);
        }
        const std::vector<ANPos> positions = WithTextPositions(content, textUnits);
        const ANPos start =
            rng() % 2 == 0 ? positions.front() : positions[rng() % positions.size()];
        const double skip = seed % 3 == 0 ? 0.5 : 0.0;
        const tracktest::WalkStats stats =
            tracktest::CheckWalk(doc, start, positions, rng, skip, rng() % 4 == 0);
        fullCalls += stats.fullCalls;
        reports += stats.reports;
        if (::testing::Test::HasFailure()) break;
    }
    EXPECT_GT(fullCalls, 1000);
    EXPECT_GT(reports, 1000);
}

// The scene a viewer meets: style 7 registered for the document, a passage marked with
// a highlight naming it; its colours at the passage's start, cleared at its end.
TEST_F(TrackWalkTest, HighlightNamingADocumentStyleIsDrawnInItsColours) {
    Doc doc(annotest::PlainDocument(6));
    ASSERT_EQ(ANInit(doc, global_, nullptr, nullptr), AN_OK);
    const ANHiliteStyle seven{
        ANHILITESTYLE_SIZE, 7, ANSTYLE_COLOR1 | ANSTYLE_COLOR2, 0x0000FF, 0xFFFFFF, 0, 0, 0};
    ASSERT_EQ(ANAddHiliteStyle(doc, &seven), AN_OK);
    ASSERT_EQ(annotest::AddHilite(doc, Pos(2), Pos(4), 1, ANSTYLEWORD_NUMBER | 7, 0xFEED), AN_OK);

    ANTrackInfo track{};
    ANPos p = Pos(0);
    ASSERT_EQ(ANStartAnnoTrack(doc, &p, &track), ANTRACK_ACTIVE);
    std::vector<uint32_t> bits;
    for (uint32_t i = 0; i < 6; ++i) {
        p = Pos(i);
        bits.push_back(ANTrackAnno(doc, &p, &track));
        if (i == 2) {
            EXPECT_EQ(track.color1Set, 1u);
            EXPECT_EQ(track.color1, 0x0000FFu);
            EXPECT_EQ(track.color2, 0xFFFFFFu);
            EXPECT_EQ(track.userData, 0xFEEDu);
        }
    }
    EXPECT_EQ(bits, (std::vector<uint32_t>{0, 0, ANTRACK_BIT_HILITE, 0, ANTRACK_BIT_HILITE, 0}));
    EXPECT_EQ(track.color1Set + track.color2Set + track.attrSet, 0u);
    EXPECT_EQ(ANEndAnnoTrack(doc, &track), 0u);
}

}  // namespace
