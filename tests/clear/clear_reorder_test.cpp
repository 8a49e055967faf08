// A clear removes every entry it selects, also one that renumbering the annotation
// text moves in front of the entries the walk has already passed (found by the fuzz
// target).
#include <gtest/gtest.h>

#include <vector>

#include "support/add_helpers.h"
#include "support/fixture.h"
#include "support/invariants.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;

class ClearReorderTest : public annotest::LeakCheckedTest {
 protected:
    static DAHandle NewDoc() {
        antk::DocumentBuilder builder;
        builder.textItem("ab");
        builder.item(antk::kItemParagraph);
        DAHandle doc = builder.build();
        EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        return doc;
    }
};

TEST_F(ClearReorderTest, EntriesMovedBehindTheWalkByRenumberingAreStillRemoved) {
    Doc source(NewDoc());
    Doc doc(NewDoc());
    // At the first character: a placeholder, a point moved into the text behind it,
    // and an empty text that is now the last text there.
    ASSERT_EQ(annotest::AddPlaceholder(source, Pos(0, 0), 7), AN_OK);
    ASSERT_EQ(annotest::AddPoint(source, Pos(0, 0), 3, 0, AN_TYPE_VALUE), AN_OK);
    ASSERT_EQ(annotest::AddText(source, Pos(0, 0), u"", 2), AN_OK);
    // On the item itself, whose annotation text interleaves with the character's.
    ASSERT_EQ(annotest::AddHilite(doc, TextPos(0, ANPOS_NOSUBITEM, 1), Pos(0), 7), AN_OK);
    ASSERT_EQ(ANCopyAnnos(doc, source), AN_OK);
    ASSERT_EQ(annotest::ListedEntries(doc).size(), 4u);

    // Removing the placeholder renumbers the point down to index 0, in front of the
    // highlight that the walk goes on with.
    annotest::Notifications heard;
    heard.Attach(doc);
    EXPECT_EQ(ANClearAnnos(doc, 0, 0), AN_OK);
    EXPECT_TRUE(annotest::ListedEntries(doc).empty());
    EXPECT_EQ(annotest::TableOf(doc), nullptr);
    EXPECT_EQ(heard.calls.size(), 4u) << "each removed entry is announced once";
}

}  // namespace
