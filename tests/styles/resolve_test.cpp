// How tracking turns a highlight's style word into colours and attributes.
#include <gtest/gtest.h>

#include <cstring>

#include "binding/instance.h"
#include "support/fixture.h"
#include "tracking/hand_table.h"

namespace {

using annotest::Doc;
using annotest::PlainDocument;
using annotest::Pos;
using antk::Fn;
using tracktest::InstallTable;
using tracktest::Rec;

constexpr uint32_t kPalette[16] = {0x000000, 0x000080, 0x008000, 0x008080, 0x800000, 0x800080,
                                   0x808000, 0xC0C0C0, 0x808080, 0x0000FF, 0x00FF00, 0x00FFFF,
                                   0xFF0000, 0xFF00FF, 0xFFFF00, 0xFFFFFF};
constexpr uint32_t kUntouched = 0xA5A5A5A5;
constexpr uint64_t kUserData = 0x1122334455667788;
constexpr uint32_t kNumber = ANSTYLEWORD_NUMBER;

ANHiliteStyle Style(uint32_t id, uint32_t flags, uint32_t color1, uint32_t color2,
                    uint16_t attr1 = 0x10, uint16_t attr2 = 0x20) {
    return ANHiliteStyle{ANHILITESTYLE_SIZE, id, flags, color1, color2, attr1, attr2, 0};
}

struct Resolved {
    uint32_t bits;
    ANTrackInfo track;
};

class ResolveTest : public annotest::LeakCheckedTest {
 protected:
    void SetUp() override {
        LeakCheckedTest::SetUp();
        ASSERT_EQ(ANInitGlobalHiliteStyles(&global_), AN_OK);
    }
    void TearDown() override {
        ANDeInitGlobalHiliteStyles(global_);
        LeakCheckedTest::TearDown();
    }

    void AddGlobal(const ANHiliteStyle &style) {
        ASSERT_EQ(ANAddGlobalHiliteStyle(global_, &style), AN_OK);
    }

    // Tracks one highlight with `word` at its start, over a record whose every field
    // holds a marker beforehand, so that fields left alone show.
    Resolved TrackWord(DAHandle doc, uint32_t word) {
        InstallTable(doc, {{0, AN_TYPE_HILITE, Rec(Pos(1), Pos(3), kUserData, 0, word)}});
        Resolved out{};
        std::memset(&out.track, 0xA5, sizeof out.track);
        out.track.markActive = 0;
        const ANPos at = Pos(1);
        EXPECT_EQ(ANStartAnnoTrack(doc, &at, &out.track), ANTRACK_ACTIVE);
        out.bits = ANTrackAnno(doc, &at, &out.track);
        EXPECT_EQ(out.track.hiliteEntry, 0);
        EXPECT_EQ(out.track.userData, kUserData) << "userData is set whatever the word";
        return out;
    }

    // A fresh document bound to the global table, with `local` in its own table.
    Resolved Resolve(uint32_t word, std::initializer_list<ANHiliteStyle> local = {}) {
        Doc doc(PlainDocument(4));
        EXPECT_EQ(ANInit(doc, global_, nullptr, nullptr), AN_OK);
        for (const ANHiliteStyle &s : local) EXPECT_EQ(ANAddHiliteStyle(doc, &s), AN_OK);
        return TrackWord(doc, word);
    }

    ANStyleTable *global_ = nullptr;
};

TEST_F(ResolveTest, DirectWordsIndexThePaletteForBothColours) {
    for (uint32_t i = 0; i < 16; ++i) {
        const Resolved r = Resolve((i << 4) | (15 - i));
        EXPECT_EQ(r.bits, ANTRACK_BIT_HILITE);
        EXPECT_EQ(r.track.color1Set, 1u);
        EXPECT_EQ(r.track.color2Set, 1u);
        EXPECT_EQ(r.track.attrSet, 0u);
        EXPECT_EQ(r.track.color1, kPalette[i]) << i;
        EXPECT_EQ(r.track.color2, kPalette[15 - i]) << i;
        EXPECT_EQ(r.track.attr1, kUntouched) << "a direct word writes no attributes";
        EXPECT_EQ(r.track.attr2, kUntouched);
    }
    const Resolved zero = Resolve(0);
    EXPECT_EQ(zero.track.color1, 0u);
    EXPECT_EQ(zero.track.color2, 0u);
    EXPECT_EQ(zero.track.color1Set + zero.track.color2Set, 2u);
    const Resolved f1 = Resolve(0xF1);
    EXPECT_EQ(f1.track.color1, 0xFFFFFFu);
    EXPECT_EQ(f1.track.color2, 0x000080u);
}

TEST_F(ResolveTest, ColourOffBitsClearTheFlagAndWriteNoColour) {
    const Resolved no2 = Resolve(ANSTYLEWORD_NOCOLOR2 | 0x4C);
    EXPECT_EQ(no2.track.color2Set, 0u);
    EXPECT_EQ(no2.track.color2, kUntouched);
    EXPECT_EQ(no2.track.color1Set, 1u);
    EXPECT_EQ(no2.track.color1, 0x800000u);

    const Resolved no1 = Resolve(ANSTYLEWORD_NOCOLOR1 | 0x4C);
    EXPECT_EQ(no1.track.color1Set, 0u);
    EXPECT_EQ(no1.track.color1, kUntouched);
    EXPECT_EQ(no1.track.color2Set, 1u);
    EXPECT_EQ(no1.track.color2, 0xFF0000u);

    const Resolved none = Resolve(ANSTYLEWORD_NOCOLOR1 | ANSTYLEWORD_NOCOLOR2 | 0xFF);
    EXPECT_EQ(none.bits, ANTRACK_BIT_HILITE);
    EXPECT_EQ(none.track.color1Set + none.track.color2Set + none.track.attrSet, 0u);
    EXPECT_EQ(none.track.color1, kUntouched);
    EXPECT_EQ(none.track.color2, kUntouched);
}

TEST_F(ResolveTest, IgnoredBitsChangeNothing) {
    // A direct word: bits 8-27 and 31.
    const Resolved plain = Resolve(0x5A);
    const Resolved noisy = Resolve(0x8FFFFF00u | 0x5A);
    EXPECT_EQ(std::memcmp(&plain.track, &noisy.track, sizeof plain.track), 0);
    EXPECT_EQ(noisy.bits, ANTRACK_BIT_HILITE);

    // A style number: bits 16-29 and 31, the colour-off bits among them.
    AddGlobal(Style(7, ANSTYLE_COLOR1 | ANSTYLE_COLOR2, 0x123456, 0x654321));
    const Resolved number = Resolve(kNumber | 7);
    const Resolved noisyNumber = Resolve(0xBFFF0000u | kNumber | 7);
    EXPECT_EQ(number.track.color1, 0x123456u);
    EXPECT_EQ(std::memcmp(&number.track, &noisyNumber.track, sizeof number.track), 0);
}

TEST_F(ResolveTest, StyleNumbersLookInTheDocumentFirstThenGlobally) {
    AddGlobal(Style(7, 0x7, 0x111111, 0x222222, 1, 2));
    const Resolved global = Resolve(kNumber | 7);
    EXPECT_EQ(global.track.color1, 0x111111u);
    EXPECT_EQ(global.track.color2, 0x222222u);
    EXPECT_EQ(global.track.attr1, 1u);
    EXPECT_EQ(global.track.attr2, 2u);

    const Resolved local = Resolve(kNumber | 7, {Style(7, 0x7, 0x333333, 0x444444, 3, 4)});
    EXPECT_EQ(local.track.color1, 0x333333u);
    EXPECT_EQ(local.track.color2, 0x444444u);
    EXPECT_EQ(local.track.attr1, 3u);
    EXPECT_EQ(local.track.attr2, 4u);
    EXPECT_EQ(local.track.color1Set + local.track.color2Set + local.track.attrSet, 3u);
}

TEST_F(ResolveTest, FoundStylesWriteAllValuesAndSwitchOnOnlyTheirFlags) {
    struct FlagCase {
        uint32_t flags;
        uint32_t color1Set, color2Set, attrSet;
    };
    for (const FlagCase &c :
         {FlagCase{0, 0, 0, 0}, FlagCase{1, 1, 0, 0}, FlagCase{2, 0, 1, 0}, FlagCase{4, 0, 0, 1},
          FlagCase{7, 1, 1, 1}, FlagCase{0xFFFFFFF8, 0, 0, 0}}) {
        const Resolved r = Resolve(kNumber | 9, {Style(9, c.flags, 0xABCDEF, 0xFEDCBA, 5, 6)});
        EXPECT_EQ(r.bits, ANTRACK_BIT_HILITE);
        EXPECT_EQ(r.track.color1Set, c.color1Set) << c.flags;
        EXPECT_EQ(r.track.color2Set, c.color2Set) << c.flags;
        EXPECT_EQ(r.track.attrSet, c.attrSet) << c.flags;
        EXPECT_EQ(r.track.color1, 0xABCDEFu) << "written whatever the flags say";
        EXPECT_EQ(r.track.color2, 0xFEDCBAu);
        EXPECT_EQ(r.track.attr1, 5u);
        EXPECT_EQ(r.track.attr2, 6u);
    }
}

TEST_F(ResolveTest, AttributesAreWidenedWithZeros) {
    ANHiliteStyle old = Style(11, ANSTYLE_ATTR, 0, 0, 0xFFFE, 0);
    old.size = ANHILITESTYLE_SIZE_OLD;
    AddGlobal(old);
    const Resolved r = Resolve(kNumber | 11);
    EXPECT_EQ(r.track.attr1, 0xFFFEu);
    EXPECT_EQ(r.track.attr2, 0xFFFFu) << "the older form's missing attr2";
    EXPECT_EQ(r.track.attrSet, 1u);
}

TEST_F(ResolveTest, StyleInNeitherTableLeavesNoColoursButStillReports) {
    AddGlobal(Style(7, 0x7, 0x111111, 0x222222));
    const Resolved r = Resolve(kNumber | 8, {Style(9, 0x7, 0x999999, 0x999999)});
    EXPECT_EQ(r.bits, ANTRACK_BIT_HILITE);
    EXPECT_EQ(r.track.color1Set + r.track.color2Set + r.track.attrSet, 0u);
    EXPECT_EQ(r.track.color1, kUntouched);
    EXPECT_EQ(r.track.color2, kUntouched);
    EXPECT_EQ(r.track.attr1, kUntouched);
    EXPECT_EQ(r.track.attr2, kUntouched);
}

TEST_F(ResolveTest, WithoutADocumentTableOrStateTheGlobalTableIsNotConsulted) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    AddGlobal(Style(7, 0x7, 0x111111, 0x222222));
    {
        Doc doc(PlainDocument(4));
        anwin::failAllocation(2);  // the document's own style table
        ASSERT_EQ(ANInit(doc, global_, nullptr, nullptr), AN_OK);
        anwin::clearFailures();
        const Resolved r = TrackWord(doc, kNumber | 7);
        EXPECT_EQ(r.bits, ANTRACK_BIT_HILITE);
        EXPECT_EQ(r.track.color1Set + r.track.color2Set + r.track.attrSet, 0u);
        EXPECT_EQ(r.track.color1, kUntouched);
    }
    {
        // The style lookup finds no state when its own lookup of the state fails.
        Doc doc(PlainDocument(4));
        ASSERT_EQ(ANInit(doc, global_, nullptr, nullptr), AN_OK);
        InstallTable(doc, {{0, AN_TYPE_HILITE, Rec(Pos(1), Pos(3), kUserData, 0, kNumber | 7)}});
        ANTrackInfo track{};
        const ANPos at = Pos(1);
        ASSERT_EQ(ANStartAnnoTrack(doc, &at, &track), ANTRACK_ACTIVE);
        antk::failCall(Fn::DAGetAnno, 2, 70);
        EXPECT_EQ(ANTrackAnno(doc, &at, &track), ANTRACK_BIT_HILITE);
        EXPECT_EQ(track.color1Set + track.color2Set + track.attrSet, 0u);
        EXPECT_EQ(track.color1, 0u);
    }
#endif
}

}  // namespace
