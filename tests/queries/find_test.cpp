// Finding annotations: the six search kinds, the two tag tests, the two rules that
// pass over entries, continuing a search, and how annotation text is reported.
#include <gtest/gtest.h>

#include "support/add_helpers.h"
#include "support/fixture.h"
#include "walking/walk_support.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using annotest::TextPos;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;

class FindTest : public annotest::LeakCheckedTest {};

ANFindRecord Query(uint16_t mode, uint32_t tag, ANPos key = ANPos{}) {
    ANFindRecord find{};
    find.size = ANFINDRECORD_SIZE;
    find.mode = mode;
    find.tag = tag;
    find.key = key;
    return find;
}

// The tag of what a search finds, or 0 with the result code when it finds nothing.
struct Found {
    uint32_t code;
    uint32_t tag;
};
bool operator==(const Found &a, const Found &b) { return a.code == b.code && a.tag == b.tag; }
void PrintTo(const Found &f, std::ostream *os) { *os << "{" << f.code << ", " << f.tag << "}"; }

Found Search(DAHandle doc, ANFindRecord find, uint16_t flags = 0) {
    find.foundTag = 0xDEAD;
    const uint32_t rc = ANFindAnno(doc, flags, &find);
    return Found{rc, rc == AN_OK ? find.foundTag : 0};
}

constexpr Found None{AN_ERR_NOTFOUND, 0};
Found Hit(uint32_t tag) { return Found{AN_OK, tag}; }

constexpr uint16_t kMask = ANFIND_MASK;
constexpr uint16_t kEqual = ANFIND_EQUAL;

// Items 0 to 9. In list order:
//   0x11 highlight [1, 3)   0x12 highlight [2, 5)   0x21 point on 4   0x11 highlight [6, 7)
class FindDocTest : public FindTest {
 protected:
    void SetUp() override {
        FindTest::SetUp();
        doc_ = annotest::PlainDocument(10);
        ASSERT_EQ(ANInit(doc_, nullptr, nullptr, nullptr), AN_OK);
        ASSERT_EQ(annotest::AddHilite(doc_, Pos(1), Pos(3), 0x11, 0, 101), AN_OK);
        ASSERT_EQ(annotest::AddHilite(doc_, Pos(2), Pos(5), 0x12, 0, 102), AN_OK);
        ASSERT_EQ(annotest::AddPoint(doc_, Pos(4), 0x21, 0, AN_TYPE_POINT, 0, 103), AN_OK);
        ASSERT_EQ(annotest::AddHilite(doc_, Pos(6), Pos(7), 0x11, 0, 104), AN_OK);
    }
    void TearDown() override {
        ANDeInit(doc_);
        antk::destroyDocument(doc_);
        FindTest::TearDown();
    }
    DAHandle doc_ = nullptr;
};

TEST_F(FindDocTest, FirstAndLastWithBothTagTests) {
    EXPECT_EQ(Search(doc_, Query(ANFIND_FIRST | kMask, 0)), Hit(0x11));
    EXPECT_EQ(Search(doc_, Query(ANFIND_FIRST | kMask, 0x20)), Hit(0x21));
    EXPECT_EQ(Search(doc_, Query(ANFIND_FIRST | kEqual, 0x12)), Hit(0x12));
    EXPECT_EQ(Search(doc_, Query(ANFIND_FIRST | kEqual, 0x10)), None);
    EXPECT_EQ(Search(doc_, Query(ANFIND_LAST | kMask, 0)), Hit(0x11));
    EXPECT_EQ(Search(doc_, Query(ANFIND_LAST | kEqual, 0x12)), Hit(0x12));
    EXPECT_EQ(Search(doc_, Query(ANFIND_LAST | kMask, 0x02)), Hit(0x12));
    // The mask test wins when both are asked for.
    EXPECT_EQ(Search(doc_, Query(ANFIND_FIRST | kMask | kEqual, 0x20)), Hit(0x21));
    // Bits beyond the kind and the two tests are not read.
    EXPECT_EQ(Search(doc_, Query(ANFIND_FIRST | kMask | 0x0400, 0x20)), Hit(0x21));
}

TEST_F(FindDocTest, WithoutATagTestNothingIsFound) {
    for (uint16_t kind = ANFIND_FIRST; kind <= ANFIND_AT; ++kind) {
        EXPECT_EQ(Search(doc_, Query(kind, 0, Pos(3))), None) << "kind " << kind;
    }
}

TEST_F(FindDocTest, CoveringTheKeyWithAnExclusiveEnd) {
    EXPECT_EQ(Search(doc_, Query(ANFIND_AT | kMask, 0, Pos(1))), Hit(0x11)) << "start included";
    EXPECT_EQ(Search(doc_, Query(ANFIND_AT | kMask, 0, Pos(3))), Hit(0x12)) << "end excluded";
    EXPECT_EQ(Search(doc_, Query(ANFIND_AT | kEqual, 0x21, Pos(4))), Hit(0x21));
    EXPECT_EQ(Search(doc_, Query(ANFIND_AT | kEqual, 0x21, Pos(4, 0))), None);
    EXPECT_EQ(Search(doc_, Query(ANFIND_AT | kMask, 0, Pos(5))), None);
    EXPECT_EQ(Search(doc_, Query(ANFIND_AT | kEqual, 0x11, Pos(6))), Hit(0x11));
}

TEST_F(FindDocTest, FromTheKeyOnOnlyTheTagIsTestedAfterTheFirstCandidate) {
    EXPECT_EQ(Search(doc_, Query(ANFIND_FROM | kMask, 0x20, Pos(0))), Hit(0x21))
        << "a key before everything finds the first that passes the tag test";
    EXPECT_EQ(Search(doc_, Query(ANFIND_FROM | kMask, 0, Pos(2))), Hit(0x12)) << "start == key";
    EXPECT_EQ(Search(doc_, Query(ANFIND_FROM | kEqual, 0x11, Pos(2))), Hit(0x11));
    ANFindRecord find = Query(ANFIND_FROM | kEqual, 0x11, Pos(2));
    ASSERT_EQ(ANFindAnno(doc_, 0, &find), AN_OK);
    EXPECT_EQ(find.foundStart, Pos(6));
    EXPECT_EQ(find.foundEnd, Pos(7));
    EXPECT_EQ(find.foundUserData, 104u);
    EXPECT_EQ(Search(doc_, Query(ANFIND_FROM | kMask, 0, Pos(7))), None);
}

TEST_F(FindDocTest, AfterTheKeyAndContinuingAfterThePreviousResult) {
    EXPECT_EQ(Search(doc_, Query(ANFIND_AFTER | kMask, 0, Pos(1))), Hit(0x12)) << "start > key";
    // Each result's end is the lower bound of the next search.
    ANFindRecord find = Query(ANFIND_AFTER | kMask, 0, Pos(0));
    find.foundEnd = Pos(0);
    std::vector<uint32_t> tags;
    while (ANFindAnno(doc_, ANFIND_AFTER_PREVIOUS, &find) == AN_OK && tags.size() < 10) {
        tags.push_back(find.foundTag);
    }
    EXPECT_EQ(tags, (std::vector<uint32_t>{0x11, 0x21, 0x11})) << "0x12 starts inside 0x11";
    // Without the flag the same record finds the same annotation again.
    EXPECT_EQ(Search(doc_, find), Hit(0x11));
    find.foundEnd = Pos(9);
    EXPECT_EQ(Search(doc_, find, ANFIND_AFTER_PREVIOUS), None);
    // Only the kind "after" reads the flag.
    ANFindRecord first = Query(ANFIND_FIRST | kMask, 0);
    first.foundEnd = Pos(9);
    EXPECT_EQ(Search(doc_, first, ANFIND_AFTER_PREVIOUS), Hit(0x11));
}

TEST_F(FindDocTest, AfterTheKeyPassesOverEntriesEndingOnAnItemForOrdinaryTags) {
    // The highlights end on items themselves (0xFFFFFFFF); the point ends on (4, 0).
    EXPECT_EQ(Search(doc_, Query(ANFIND_AFTER | kMask, 0x01, Pos(0))), Hit(0x21));
    // After the candidate only the tag counts: the last highlight is found.
    EXPECT_EQ(Search(doc_, Query(ANFIND_AFTER | kEqual, 0x11, Pos(0))), Hit(0x11));
    ANFindRecord find = Query(ANFIND_AFTER | kEqual, 0x11, Pos(0));
    ASSERT_EQ(ANFindAnno(doc_, 0, &find), AN_OK);
    EXPECT_EQ(find.foundStart, Pos(6));
    // Tag 0 rejects nothing.
    EXPECT_EQ(Search(doc_, Query(ANFIND_AFTER | kMask, 0, Pos(0))), Hit(0x11));
}

TEST_F(FindDocTest, BeforeTheKeyWalksBackFromTheEnd) {
    EXPECT_EQ(Search(doc_, Query(ANFIND_BEFORE | kMask, 0, Pos(9))), Hit(0x11));
    EXPECT_EQ(Search(doc_, Query(ANFIND_BEFORE | kMask, 0, Pos(5))), Hit(0x21))
        << "the point ends on (4, 0)";
    EXPECT_EQ(Search(doc_, Query(ANFIND_BEFORE | kMask, 0, Pos(1))), None);
}

// List order: 2 [0, 1), 3 point on 0, 1 [1, 2), 2 [2, (3, -, 5, 0)).
class FindRuleTest : public FindTest {
 protected:
    void SetUp() override {
        FindTest::SetUp();
        doc_ = annotest::PlainDocument(8);
        ASSERT_EQ(ANInit(doc_, nullptr, nullptr, nullptr), AN_OK);
        ASSERT_EQ(annotest::AddHilite(doc_, Pos(0), Pos(1), 2), AN_OK);
        ASSERT_EQ(annotest::AddPoint(doc_, Pos(0), 3), AN_OK);
        ASSERT_EQ(annotest::AddHilite(doc_, Pos(1), Pos(2), 1), AN_OK);
        ASSERT_EQ(annotest::AddHilite(doc_, Pos(2), TextPos(3, kNo, 0), 2), AN_OK);
    }
    void TearDown() override {
        ANDeInit(doc_);
        antk::destroyDocument(doc_);
        FindTest::TearDown();
    }
    DAHandle doc_ = nullptr;
};

TEST_F(FindRuleTest, BeforeTheKeyTagZeroPassesOverEndsThatTheKeyNames) {
    // The key (5, 0) names an end of kind 5 with text index 0.
    EXPECT_EQ(Search(doc_, Query(ANFIND_BEFORE | kMask, 0, Pos(5, 0))), Hit(1));
    EXPECT_EQ(Search(doc_, Query(ANFIND_BEFORE | kMask, 0, Pos(6, 0))), Hit(2));
    EXPECT_EQ(Search(doc_, Query(ANFIND_BEFORE | kMask, 0, Pos(5, 1))), Hit(2));
}

TEST_F(FindRuleTest, BeforeTheKeyOrdinaryTagsPassOverEndsOnAnItem) {
    // Both highlights that end on an item are passed; the point ends on (0, 0).
    EXPECT_EQ(Search(doc_, Query(ANFIND_BEFORE | kMask, 0x01, Pos(6, 0))), Hit(3));
    // After the candidate only the tag counts: the first highlight is found.
    EXPECT_EQ(Search(doc_, Query(ANFIND_BEFORE | kEqual, 2, Pos(6, 0))), Hit(2));
    ANFindRecord find = Query(ANFIND_BEFORE | kEqual, 2, Pos(6, 0));
    ASSERT_EQ(ANFindAnno(doc_, 0, &find), AN_OK);
    EXPECT_EQ(find.foundStart, Pos(0));
}

TEST_F(FindTest, TextAnnotationsAreReportedByTheirTextRange) {
    Doc doc(annotest::PlainDocument(4));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(1), u"wxyz", 0x100, 77), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(3), u"ab", 0x201), AN_OK);
    ASSERT_EQ(annotest::AddPlaceholder(doc, Pos(3), 0x202), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(3), u"cde", 0x203), AN_OK);

    struct Case {
        uint32_t tag;
        ANPos start;
        ANPos end;
    };
    const Case cases[] = {
        {0x100, TextPos(1, kNo, 0), Pos(1)},  // alone at its anchor
        {0x201, TextPos(3, kNo, 0), TextPos(3, kNo, 2)},
        {0x202, TextPos(3, kNo, 2), TextPos(3, kNo, 3)},
        {0x203, TextPos(3, kNo, 3), Pos(3)},  // the last text at its anchor
    };
    for (const Case &c : cases) {
        SCOPED_TRACE(c.tag);
        ANFindRecord find = Query(ANFIND_FIRST | kEqual, c.tag);
        ASSERT_EQ(ANFindAnno(doc, 0, &find), AN_OK);
        EXPECT_EQ(find.foundTag, c.tag);
        EXPECT_EQ(find.foundStart, c.start);
        EXPECT_EQ(find.foundEnd, c.end);
    }
    // The entry itself stands at its anchor's content position, after its text.
    ANFindRecord find = Query(ANFIND_AT | kEqual, 0x100, Pos(1));
    ASSERT_EQ(ANFindAnno(doc, 0, &find), AN_OK);
    EXPECT_EQ(find.foundStart, TextPos(1, kNo, 0));
    EXPECT_EQ(find.foundUserData, 77u);
}

TEST_F(FindTest, BadArgumentsAndDocumentsWithoutAnnotations) {
    Doc doc(annotest::PlainDocument(3));
    ANFindRecord find = Query(ANFIND_FIRST | kMask, 0);
    EXPECT_EQ(ANFindAnno(nullptr, 0, &find), AN_ERR_BADARG);
    EXPECT_EQ(ANFindAnno(doc, 0, nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANFindAnno(doc, 0, &find), AN_ERR_NOSTATE);
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(antk::Fn::DAGetAnno, 1, 44);
    EXPECT_EQ(ANFindAnno(doc, 0, &find), 44u);
    EXPECT_EQ(ANFindAnno(doc, 0, &find), AN_ERR_NOTFOUND) << "no table";
    ASSERT_EQ(annotest::AddHilite(doc, Pos(0), Pos(2), 9, 0, 5), AN_OK);

    const ANFindRecord untouched = [] {
        ANFindRecord r = Query(ANFIND_FIRST | kMask, 0);
        r.foundTag = 0xABCD;
        r.foundStart = ANPos{1, 2, 3, 4};
        r.foundEnd = ANPos{5, 6, 7, 8};
        r.foundUserData = 0x1234;
        return r;
    }();
    for (const uint32_t size : {64u, 0u, 73u}) {
        find = untouched;
        find.size = size;
        EXPECT_EQ(ANFindAnno(doc, 0, &find), AN_ERR_BADARG) << size;
        EXPECT_EQ(find.foundTag, 0xABCDu);
    }
    for (const uint16_t kind : {uint16_t{0}, uint16_t{7}, uint16_t{0xFF}}) {
        find = untouched;
        find.mode = kind | kMask;
        EXPECT_EQ(ANFindAnno(doc, 0, &find), AN_ERR_NOTFOUND) << kind;
        EXPECT_EQ(find.foundStart, (ANPos{1, 2, 3, 4}));
        EXPECT_EQ(find.foundUserData, 0x1234u);
    }
    find = untouched;
    find.mode = ANFIND_FIRST | kEqual;
    find.tag = 8;
    EXPECT_EQ(ANFindAnno(doc, 0, &find), AN_ERR_NOTFOUND);
    EXPECT_EQ(find.foundEnd, (ANPos{5, 6, 7, 8})) << "nothing found, nothing written";
    find = untouched;
    EXPECT_EQ(ANFindAnno(doc, 0, &find), AN_OK);
    EXPECT_EQ(find.foundTag, 9u);
    EXPECT_EQ(find.foundUserData, 5u);
}

}  // namespace
