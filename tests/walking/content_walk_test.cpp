// Walking a document's content: items, characters of text items, chunk boundaries,
// and content that a careless step would walk in circles.
#include <gtest/gtest.h>

#include "support/fixture.h"
#include "walking/walk_support.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;
using antk::Fn;
using walktest::ExpectedContent;
using walktest::Walk;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;

class ContentWalkTest : public annotest::LeakCheckedTest {};

// Plain and text items over three chunks, a text item without characters among them.
DAHandle MixedDocument() {
    antk::DocumentBuilder builder(3);
    builder.item(antk::kItemParagraph);
    builder.textItem("abc");
    builder.item(antk::kItemParagraph);
    builder.textItem("de");  // second chunk
    builder.textItem("");
    builder.item(antk::kItemParagraph);
    builder.textItem("f");  // third chunk
    return builder.build();
}

TEST_F(ContentWalkTest, VisitsEveryItemAndCharacterAcrossChunksThenEnds) {
    Doc doc(MixedDocument());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const std::vector<ANPos> expected = ExpectedContent(doc);
    ASSERT_EQ(expected.size(), 10u);

    uint32_t end = 0;
    EXPECT_EQ(Walk(doc, expected.front(), ANNextChunkerPos, &end), expected);
    EXPECT_EQ(end, AN_ERR_NOTFOUND);
    end = 0;
    EXPECT_EQ(Walk(doc, expected.front(), ANNextPos, &end), expected)
        << "without annotations the merged walk is the content walk";
    EXPECT_EQ(end, AN_ERR_NOTFOUND);
    ANPos next{};
    EXPECT_EQ(ANNextAnnoTextPos(doc, &expected.front(), &next), AN_ERR_NOTFOUND);
}

TEST_F(ContentWalkTest, TheItemItselfStandsForTheFirstCharacter) {
    antk::DocumentBuilder builder;
    builder.item(antk::kItemParagraph);
    builder.textItem("xy");                         // characters 0 and 1
    const uint32_t text = builder.textItem("abc");  // characters 2, 3 and 4
    Doc doc(builder.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const ANPos item = Pos(text, kNo);
    ANPos next{};
    ASSERT_EQ(ANNextChunkerPos(doc, &item, &next), AN_OK);
    EXPECT_EQ(next, Pos(text, 3));
    ASSERT_EQ(ANNextPos(doc, &item, &next), AN_OK);
    EXPECT_EQ(next, Pos(text, 3));
}

TEST_F(ContentWalkTest, AnnotationTextStepsToItsAnchorWithoutTheDocument) {
    const ANPos inText = TextPos(12, 7, 3);
    ANPos next{9, 9, 9, 9};
    EXPECT_EQ(ANNextChunkerPos(nullptr, &inText, &next), AN_OK);
    EXPECT_EQ(next, Pos(12, 7));
    next = ANPos{9, 9, 9, 9};
    const ANPos onItem = TextPos(12, kNo, 0);
    EXPECT_EQ(ANNextChunkerPos(nullptr, &onItem, &next), AN_OK);
    EXPECT_EQ(next, Pos(12, kNo));
}

TEST_F(ContentWalkTest, FailuresAreReportedAndLeaveTheNextPositionZeroed) {
    Doc doc(MixedDocument());
    const ANPos first = Pos(0);
    ANPos next{9, 9, 9, 9};
    EXPECT_EQ(ANNextChunkerPos(nullptr, &first, &next), AN_ERR_BADARG);
    EXPECT_EQ(ANNextChunkerPos(doc, &first, &next), AN_ERR_NOSTATE);
    EXPECT_EQ(next, Pos(0, 0)) << "zeroed before anything can fail";
    EXPECT_EQ(ANNextAnnoTextPos(nullptr, &first, &next), AN_ERR_BADARG);
    EXPECT_EQ(ANNextAnnoTextPos(doc, &first, &next), AN_ERR_NOSTATE);

    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::DAGetAnno, 1, 77);
    EXPECT_EQ(ANNextChunkerPos(doc, &first, &next), 77u);
    antk::failCall(Fn::DAGetAnno, 1, 78);
    EXPECT_EQ(ANNextAnnoTextPos(doc, &first, &next), 78u);

    const ANPos unknown = Pos(0x00050000);
    next = ANPos{9, 9, 9, 9};
    EXPECT_EQ(ANNextChunkerPos(doc, &unknown, &next), AN_ERR_NOTFOUND);
    EXPECT_EQ(next, Pos(0, 0));

    // The merged walk folds every failure into 25 and leaves `next` alone.
    next = ANPos{9, 9, 9, 9};
    EXPECT_EQ(ANNextPos(nullptr, &first, &next), AN_ERR_NOTFOUND);
    antk::failCall(Fn::DAGetAnno, 1, 79, true);
    EXPECT_EQ(ANNextPos(doc, &first, &next), AN_ERR_NOTFOUND);
    antk::clearFailures();
    EXPECT_EQ(ANNextPos(doc, &unknown, &next), AN_ERR_NOTFOUND);
    EXPECT_EQ(next, (ANPos{9, 9, 9, 9}));
}

TEST_F(ContentWalkTest, ATextItemWithoutCharactersIsOneStepLikeAnyOtherItem) {
    antk::DocumentBuilder builder;
    const uint32_t before = builder.item(antk::kItemParagraph);
    const uint32_t empty = builder.textItem("");
    const uint32_t after = builder.textItem("ab");
    Doc doc(builder.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const std::vector<ANPos> walk = Walk(doc, Pos(before), ANNextPos);
    EXPECT_EQ(walk, (std::vector<ANPos>{Pos(before), Pos(empty), Pos(after, 0), Pos(after, 1)}));
    // Even a character id on it does not make the walk turn in place.
    const ANPos bogus = Pos(empty, 0);
    ANPos next{};
    ASSERT_EQ(ANNextChunkerPos(doc, &bogus, &next), AN_OK);
    EXPECT_EQ(next, Pos(after, 0));
}

TEST_F(ContentWalkTest, ASubItemThatIsNotOneOfTheItemsCharactersDoesNotWanderOff) {
    antk::DocumentBuilder builder;
    const uint32_t first = builder.textItem("ab");    // characters 0, 1
    const uint32_t second = builder.textItem("cde");  // characters 2, 3, 4
    const uint32_t last = builder.item(antk::kItemParagraph);
    Doc doc(builder.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);

    // Below the item's characters: the next content is its first character.
    EXPECT_EQ(Walk(doc, Pos(second, 0), ANNextChunkerPos),
              (std::vector<ANPos>{Pos(second, 0), Pos(second, 2), Pos(second, 3), Pos(second, 4),
                                  Pos(last)}));
    // Beyond them: the item is done.
    EXPECT_EQ(Walk(doc, Pos(first, 3), ANNextChunkerPos),
              (std::vector<ANPos>{Pos(first, 3), Pos(second, 2), Pos(second, 3), Pos(second, 4),
                                  Pos(last)}));
    EXPECT_EQ(Walk(doc, Pos(first, 0x7000), ANNextPos).size(), 5u);
}

TEST_F(ContentWalkTest, AFailingCharacterStepEndsTheWalkInsteadOfRepeatingIt) {
    antk::DocumentBuilder builder;
    const uint32_t text = builder.textItem("abc");
    builder.item(antk::kItemParagraph);
    Doc doc(builder.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const ANPos start = Pos(text, 0);
    ANPos next{};
    antk::failCall(Fn::CHNextItemId, 1, 55);
    EXPECT_EQ(ANNextChunkerPos(doc, &start, &next), AN_ERR_NOTFOUND);
    EXPECT_EQ(next, Pos(0, 0));
    antk::failCall(Fn::CHNextItemId, 1, 55);
    EXPECT_EQ(ANNextPos(doc, &start, &next), AN_ERR_NOTFOUND);

    // Sticky: every character step fails; the walk stops at once.
    antk::failCall(Fn::CHNextItemId, 1, 55, true);
    EXPECT_EQ(Walk(doc, start, ANNextPos).size(), 1u);
    antk::clearFailures();
    EXPECT_EQ(Walk(doc, start, ANNextPos).size(), 4u);
}

TEST_F(ContentWalkTest, AFailingLookOfTheNextItemStillEntersIt) {
    antk::DocumentBuilder builder;
    const uint32_t plain = builder.item(antk::kItemParagraph);
    const uint32_t text = builder.textItem("ab");
    Doc doc(builder.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const ANPos start = Pos(plain);
    ANPos next{};
    // The first CHGetItem reads the current item, the second the next one.
    antk::failCall(Fn::CHGetItem, 2, 55);
    EXPECT_EQ(ANNextChunkerPos(doc, &start, &next), AN_OK);
    EXPECT_EQ(next, Pos(text, kNo));
}

}  // namespace
