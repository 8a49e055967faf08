// Mapping document-wide character ordinals to positions and back.
#include <gtest/gtest.h>

#include <cstring>
#include <vector>

#include "binding/instance.h"
#include "hosts/modules.h"
#include "support/fixture.h"

namespace {

using annotest::Doc;
using annotest::Pos;
using antk::Fn;

constexpr uint32_t kNo = ANPOS_NOSUBITEM;

ANInstance *StateOf(DAHandle doc) { return static_cast<ANInstance *>(antk::annoSlot(doc)); }

ANMapRecord Record(uint32_t flags, ANPos pos = Pos(0), uint32_t ordinal = 0) {
    return ANMapRecord{ANMAPRECORD_SIZE, flags, pos, ordinal};
}

// Maps `ordinal`; on success *pos gets what came back (its other fields kept).
uint32_t ToPos(DAHandle doc, uint32_t ordinal, ANPos *pos) {
    ANMapRecord map = Record(ANMAP_ORDINAL_TO_POS, *pos, ordinal);
    const uint32_t rc = ANMapPosition(doc, &map);
    *pos = map.pos;
    return rc;
}

uint32_t ToOrdinal(DAHandle doc, ANPos pos, uint32_t *ordinal) {
    ANMapRecord map = Record(ANMAP_POS_TO_ORDINAL, pos, *ordinal);
    const uint32_t rc = ANMapPosition(doc, &map);
    *ordinal = map.ordinal;
    return rc;
}

// Three chunks: [head, "Hello", gap, "ab"] [“xyz”, mid, "pq"] ["last", tail].
// Ordinals: Hello 0-4, ab 5-6, xyz 7-9, pq 10-11, last 12-15.
struct Sample {
    uint32_t head, hello, gap, ab, xyz, mid, pq, last, tail;
};

DAHandle BuildSample(Sample *s, uint32_t option = 0) {
    antk::DocumentBuilder b;
    s->head = b.item(antk::kItemParagraph);
    s->hello = b.textItem("Hello");
    s->gap = b.item(antk::kItemParagraph);
    s->ab = b.textItem("ab");
    b.newChunk();
    s->xyz = b.textItem("xyz");
    s->mid = b.item(antk::kItemParagraph);
    s->pq = b.textItem("pq");
    b.newChunk();
    s->last = b.textItem("last");
    s->tail = b.item(antk::kItemParagraph);
    if (option != 0) b.option(option);
    return b.build();
}

// Every character of the document with the position it should map to.
std::vector<ANPos> ExpectedPositions(DAHandle doc) {
    std::vector<ANPos> out;
    for (const antk::ItemView &item : antk::items(doc)) {
        for (uint32_t i = 0; i < item.charCount; ++i)
            out.push_back(Pos(item.id, item.firstChar + i));
    }
    return out;
}

// What the reader handed to CAReadNext, and what came back, read by read.
struct Read {
    uint32_t type, flags, room, charCount, written;
    const unsigned char *buffer;
    std::vector<unsigned char> passed;  // bytes the reader moved over after this read
};

// Logs the reads of one chunk's content. Like a module may, it scribbles over the
// room it did not fill, so zero-filled text shows up as zeros.
class ReadLog {
 public:
    ReadLog() {
        antk::setContentReadHook([this](CAReadRecord *r) {
            const auto *at = static_cast<const unsigned char *>(r->buffer);
            if (!reads.empty() && at != nullptr)
                reads.back().passed.assign(reads.back().buffer, at);
            reads.push_back({r->type, r->flags, r->room, r->charCount, r->written, at, {}});
            const uint32_t used = r->type == ANMOD_READ_TEXT ? r->written : 0;
            if (at != nullptr && used < r->room) {
                std::memset(static_cast<unsigned char *>(r->buffer) + used, 0xAA, r->room - used);
            }
        });
    }
    ~ReadLog() { antk::setContentReadHook(nullptr); }
    ReadLog(const ReadLog &) = delete;
    ReadLog &operator=(const ReadLog &) = delete;
    std::vector<Read> reads;
};

class MappingTest : public annotest::LeakCheckedTest {};

TEST_F(MappingTest, EveryOrdinalMapsToItsItemAndCharacterAndBack) {
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const std::vector<ANPos> expected = ExpectedPositions(doc);
    ASSERT_EQ(expected.size(), 16u);
    EXPECT_EQ(expected[7], Pos(s.xyz, 0x10000));
    for (uint32_t ordinal = 0; ordinal < expected.size(); ++ordinal) {
        ANPos pos = Pos(0);
        ASSERT_EQ(ToPos(doc, ordinal, &pos), AN_OK) << ordinal;
        EXPECT_EQ(pos, expected[ordinal]) << ordinal;
        uint32_t back = 0;
        ASSERT_EQ(ToOrdinal(doc, pos, &back), AN_OK);
        EXPECT_EQ(back, ordinal);
    }
    ANPos pos = Pos(0);
    EXPECT_EQ(ToPos(doc, 16, &pos), AN_ERR_NOTFOUND) << "past the last character";
}

TEST_F(MappingTest, AnItemMapsToItsFirstCharacterOrTheFirstOneAfterIt) {
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const struct {
        ANPos pos;
        uint32_t ordinal;
    } cases[] = {
        {Pos(s.hello), 0},        {Pos(s.ab), 5},    {Pos(s.head), 0}, {Pos(s.gap), 5},
        {Pos(s.mid), 10},         {Pos(s.tail), 16},  // after the chunk's last character
        {Pos(s.ab, 1), 5},                            // a character of another item
        {Pos(s.pq, 0x20001), 10},                     // a character id of another chunk
        {Pos(s.xyz, 0x10002), 9},
    };
    for (const auto &c : cases) {
        uint32_t ordinal = 999;
        ASSERT_EQ(ToOrdinal(doc, c.pos, &ordinal), AN_OK) << ::testing::PrintToString(c.pos);
        EXPECT_EQ(ordinal, c.ordinal) << ::testing::PrintToString(c.pos);
    }
    uint32_t ordinal = 999;
    EXPECT_EQ(ToOrdinal(doc, Pos(0x00050000), &ordinal), AN_ERR_NOTFOUND) << "no such run";
    EXPECT_EQ(ordinal, 999u);
}

TEST_F(MappingTest, AChunkWithoutCharactersMapsItsItemsToTheNextOrdinal) {
    antk::DocumentBuilder b;
    b.textItem("abc");
    b.newChunk();
    const uint32_t bare = b.item(antk::kItemParagraph);
    b.newChunk();
    b.textItem("d");
    Doc doc(b.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    uint32_t ordinal = 0;
    EXPECT_EQ(ToOrdinal(doc, Pos(bare), &ordinal), AN_OK);
    EXPECT_EQ(ordinal, 3u);
    EXPECT_EQ(StateOf(doc)->mapCache[0].block, nullptr) << "no characters, no block";
}

TEST_F(MappingTest, CharactersOfANonTextItemMapToTheItemItself) {
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    // The content module reports the text of "ab" as belonging to the paragraph before it.
    antk::setContentReadHook([&](CAReadRecord *r) {
        if (r->type == ANMOD_READ_TEXT && r->itemIndex == (s.ab & 0xFFFF))
            r->itemIndex = s.gap & 0xFFFF;
    });
    ANPos pos = Pos(0);
    ASSERT_EQ(ToPos(doc, 6, &pos), AN_OK);
    EXPECT_EQ(pos, Pos(s.gap, kNo));
    uint32_t ordinal = 0;
    ASSERT_EQ(ToOrdinal(doc, pos, &ordinal), AN_OK);
    EXPECT_EQ(ordinal, 5u) << "the item's first character";

    // When the chunker cannot say what the item is, the character is kept.
    ASSERT_EQ(ToPos(doc, 1, &pos), AN_OK);  // chunk 0 stays the recent one
    antk::failCall(Fn::CHGetItem, 1, 77);
    ASSERT_EQ(ToPos(doc, 6, &pos), AN_OK);
    EXPECT_EQ(pos, Pos(s.gap, 6));
}

TEST_F(MappingTest, KindAndTextIndexComeBackAsTheyWentIn) {
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ANMapRecord map = Record(ANMAP_ORDINAL_TO_POS, Pos(1, 2, ANPOS_ANNOTEXT, 9), 8);
    ASSERT_EQ(ANMapPosition(doc, &map), AN_OK);
    EXPECT_EQ(map.pos, Pos(s.xyz, 0x10001, ANPOS_ANNOTEXT, 9));
    EXPECT_EQ(map.ordinal, 8u);
    map = Record(ANMAP_POS_TO_ORDINAL, Pos(s.pq, 0x10004, 3, 77), 0);
    ASSERT_EQ(ANMapPosition(doc, &map), AN_OK);
    EXPECT_EQ(map.ordinal, 11u);
    EXPECT_EQ(map.pos, Pos(s.pq, 0x10004, 3, 77));
}

TEST_F(MappingTest, BadRecordsAndFlagsAreRefusedUntouched) {
    Sample s;
    Doc doc(BuildSample(&s));
    ANMapRecord map = Record(ANMAP_ORDINAL_TO_POS);
    EXPECT_EQ(ANMapPosition(nullptr, &map), AN_ERR_BADARG);
    EXPECT_EQ(ANMapPosition(doc, &map), AN_ERR_NOSTATE);
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::DAGetAnno, 1, 61);
    EXPECT_EQ(ANMapPosition(doc, &map), 61u);
    EXPECT_EQ(ANMapPosition(doc, nullptr), AN_ERR_BADARG);

    antk::resetCalls();
    for (uint32_t size = 0; size <= 128; ++size) {
        if (size == ANMAPRECORD_SIZE) continue;
        map = Record(ANMAP_ORDINAL_TO_POS, Pos(4, 4, 4, 4), 3);
        map.size = size;
        const ANMapRecord before = map;
        EXPECT_EQ(ANMapPosition(doc, &map), AN_ERR_BADARG) << size;
        EXPECT_EQ(std::memcmp(&map, &before, sizeof map), 0) << size;
    }
    for (uint32_t flags : {0u, 4u, 0x80000000u}) {
        map = Record(flags, Pos(s.hello), 3);
        EXPECT_EQ(ANMapPosition(doc, &map), AN_ERR_BADARG) << flags;
        EXPECT_EQ(map.pos, Pos(s.hello));
    }
    EXPECT_EQ(antk::calls(Fn::CHGetItemId) + antk::calls(Fn::CHGetRunInfo), 0u);

    map = Record(ANMAP_ORDINAL_TO_POS | ANMAP_POS_TO_ORDINAL, Pos(s.ab), 3);
    ASSERT_EQ(ANMapPosition(doc, &map), AN_OK);
    EXPECT_EQ(map.pos, Pos(s.hello, 3)) << "ordinal to position wins";
    EXPECT_EQ(map.ordinal, 3u);
}

// ---- The cache ---------------------------------------------------------------------

TEST_F(MappingTest, TwoChunksAreReadOnceEachAndAThirdEvictsTheOlder) {
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    const ANCharMap *cache = StateOf(doc)->mapCache;
#if ANNO_HAVE_PLATFORM_CONTROLS
    const int64_t blocks = anwin::globalBlocks();
#endif
    antk::resetCalls();
    ANPos pos = Pos(0);
    for (uint32_t ordinal : {0u, 8u, 1u, 9u, 6u, 7u}) ASSERT_EQ(ToPos(doc, ordinal, &pos), AN_OK);
    EXPECT_EQ(antk::calls(Fn::CASeek), 2u) << "alternating chunks read each once";
    EXPECT_EQ(cache[0].chunk, 1);
    EXPECT_EQ(cache[1].chunk, 0);
    EXPECT_EQ(cache[0].base, 7u);
    EXPECT_EQ(cache[0].length, 5u);

    ASSERT_EQ(ToPos(doc, 13, &pos), AN_OK);  // chunk 2 pushes out chunk 0
    EXPECT_EQ(antk::calls(Fn::CASeek), 3u);
    EXPECT_EQ(cache[0].chunk, 2);
    EXPECT_EQ(cache[1].chunk, 1);
    ASSERT_EQ(ToPos(doc, 10, &pos), AN_OK);
    EXPECT_EQ(antk::calls(Fn::CASeek), 3u) << "chunk 1 was still cached";
    ASSERT_EQ(ToPos(doc, 2, &pos), AN_OK);
    EXPECT_EQ(antk::calls(Fn::CASeek), 4u) << "chunk 0 was read again";
    EXPECT_EQ(pos, Pos(s.hello, 2));
#if ANNO_HAVE_PLATFORM_CONTROLS
    EXPECT_EQ(anwin::globalBlocks(), blocks + 2)
        << "two maps, no scratch buffer, nothing evicted kept";
#endif
    EXPECT_EQ(antk::calls(Fn::DAOpenDocument), 1u) << "the content is opened once";
    EXPECT_EQ(antk::calls(Fn::CAOpenContent), 1u);
}

TEST_F(MappingTest, TheRecentChunkIsMappedWithoutAskingTheChunker) {
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ANPos pos = Pos(0);
    ASSERT_EQ(ToPos(doc, 8, &pos), AN_OK);
    antk::resetCalls();
    ASSERT_EQ(ToPos(doc, 11, &pos), AN_OK);
    EXPECT_EQ(pos, Pos(s.pq, 0x10004));
    EXPECT_EQ(antk::calls(Fn::CHGetItemId), 0u);
    EXPECT_EQ(antk::calls(Fn::CAReadNext), 0u);
}

TEST_F(MappingTest, DeInitFreesTheMapsAndClosesTheContent) {
    Sample s;
    Doc doc(BuildSample(&s));
    Sample s2;
    Doc other(BuildSample(&s2));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(other, nullptr, nullptr, nullptr), AN_OK);
    ANPos pos = Pos(0);
    for (uint32_t ordinal : {0u, 8u, 13u}) ASSERT_EQ(ToPos(doc, ordinal, &pos), AN_OK);
    ASSERT_EQ(ToPos(other, 0, &pos), AN_OK);
    EXPECT_EQ(antk::openSecondaryDocuments(), 2) << "one content document per document";
    EXPECT_EQ(antk::openContents(), 2);
    EXPECT_EQ(ANDeInit(doc), AN_OK);
    EXPECT_EQ(ANDeInit(other), AN_OK);
    EXPECT_EQ(antk::openSecondaryDocuments(), 0);
    EXPECT_EQ(antk::openContents(), 0);
    // The fixture checks that no global-memory block is left.
}

// ---- Reading content ---------------------------------------------------------------

// Hidden text is still counted in the map; the reader moves over it and fills it with zeros.
TEST_F(MappingTest, TextThatIsNotTakenIsMappedAndFilledWithZeros) {
    for (uint32_t hiddenFlags : {0x10000u, 0x100000u, 0x120000u, 0u /* piece flag */}) {
        SCOPED_TRACE(hiddenFlags);
        antk::DocumentBuilder b;
        const uint32_t hidden = b.textItem("abc");
        const uint32_t shown = b.textItem("de");
        b.hideItemText(hidden, hiddenFlags);
        Doc doc(b.build());
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        ReadLog log;
        ANPos pos = Pos(0);
        ASSERT_EQ(ToPos(doc, 4, &pos), AN_OK);
        EXPECT_EQ(pos, Pos(shown, 4));
        ASSERT_EQ(ToPos(doc, 1, &pos), AN_OK);
        EXPECT_EQ(pos, Pos(hidden, 1));

        // Narrow text: 5 characters, 10 bytes of room; the hidden piece takes 3.
        const Read *piece = nullptr;
        for (const Read &r : log.reads) {
            if (r.type == ANMOD_READ_TEXT && r.written == 0) piece = &r;
        }
        ASSERT_NE(piece, nullptr);
        EXPECT_EQ(piece->room, 10u);
        EXPECT_EQ(piece->passed, std::vector<unsigned char>(3, 0));
        const Read &after = log.reads[static_cast<size_t>(piece - log.reads.data()) + 1 +
                                      (hiddenFlags != 0 ? 1 : 0)];
        ASSERT_EQ(after.type, ANMOD_READ_TEXT);
        EXPECT_EQ(after.room, 7u);
        EXPECT_EQ(after.passed, (std::vector<unsigned char>{'d', 'e'})) << "taken again";
        EXPECT_EQ(log.reads.back().type, ANMOD_READ_END);
        EXPECT_EQ(log.reads.back().room, 5u);
    }
}

TEST_F(MappingTest, OtherSpanFlagsDoNotHideText) {
    antk::DocumentBuilder b;
    b.textItem("x");
    const uint32_t odd = b.textItem("abc");
    b.hideItemText(odd, 0x20000);
    Doc doc(b.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ReadLog log;
    ANPos pos = Pos(0);
    ASSERT_EQ(ToPos(doc, 3, &pos), AN_OK);
    EXPECT_EQ(pos, Pos(odd, 3));
    // The module wrote nothing for it, and the reader takes it at its word.
    EXPECT_EQ(log.reads.back().room, 8 - 1u);
}

TEST_F(MappingTest, PiecesOfOddAndEvenSizesMoveTheBufferByTheirBytes) {
    for (uint32_t option : {0u, 0x10u}) {
        SCOPED_TRACE(option);
        antk::DocumentBuilder b;
        const uint32_t a = b.textItem("abc");
        const uint32_t hidden = b.textItem("ef");
        const uint32_t c = b.textItem("g");
        b.hideItemText(hidden, 0);
        b.option(option);
        Doc doc(b.build());
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        ReadLog log;
        ANPos pos = Pos(0);
        ASSERT_EQ(ToPos(doc, 5, &pos), AN_OK);
        EXPECT_EQ(pos, Pos(c, 5));
        ASSERT_EQ(ToPos(doc, 0, &pos), AN_OK);
        EXPECT_EQ(pos, Pos(a, 0));
        const uint32_t width = option != 0 ? 2 : 1;
        std::vector<uint32_t> rooms;
        for (const Read &r : log.reads) rooms.push_back(r.room);
        EXPECT_EQ(rooms,
                  (std::vector<uint32_t>{12, 12 - 3 * width, 12 - 5 * width, 12 - 6 * width}));
        EXPECT_EQ(log.reads[1].passed, std::vector<unsigned char>(2 * width, 0));
        const std::vector<unsigned char> text =
            option != 0 ? std::vector<unsigned char>{'a', 0, 'b', 0, 'c', 0}
                        : std::vector<unsigned char>{'a', 'b', 'c'};
        EXPECT_EQ(log.reads[0].passed, text);
    }
}

// A module that reports more than it could have read, or more than there was room
// for, must not make the reader write outside its buffers (the sanitizer build
// catches any write past a block).
TEST_F(MappingTest, HostileReportsNeverTakeTheReaderOutsideItsBuffers) {
    struct Lie {
        const char *what;
        void (*apply)(CAReadRecord *);
        uint32_t length;  // characters recorded for the chunk of 5
    };
    const Lie lies[] = {
        {"charCount far beyond the chunk", [](CAReadRecord *r) { r->charCount = 0xFFFFFFFF; }, 5},
        {"written far beyond the room", [](CAReadRecord *r) { r->written = 0xFFFFFFFF; }, 2},
        {"written one past the room", [](CAReadRecord *r) { r->written = r->room + 1; }, 2},
        {"hidden text far beyond the room",
         [](CAReadRecord *r) {
             r->flags |= ANMOD_READ_NOT_TAKEN;
             r->charCount = 0x7FFFFFFF;
             r->charSet = ANMOD_CHARSET_WIDE;
         },
         5},
        {"an odd piece leaving one byte",  // the padding byte goes into the last one
         [](CAReadRecord *r) {
             if (r->room != 10) {
                 r->type = ANMOD_READ_END;
                 return;
             }
             r->flags |= ANMOD_READ_NOT_TAKEN;
             r->charCount = 9;
         },
         5},
        {"charCount zero, written plenty",
         [](CAReadRecord *r) { r->charCount = 0, r->written = 7; }, 0},
    };
    for (const Lie &lie : lies) {
        SCOPED_TRACE(lie.what);
        antk::DocumentBuilder b;
        b.textItem("ab");
        b.textItem("cde");
        Doc doc(b.build());
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        const unsigned char *end = nullptr;
        bool outside = false;
        antk::setContentReadHook([&](CAReadRecord *r) {
            const auto *at = static_cast<const unsigned char *>(r->buffer);
            if (end == nullptr) end = at + r->room;
            outside = outside || at + r->room != end;
            if (r->type == ANMOD_READ_TEXT) lie.apply(r);
        });
        ANPos pos = Pos(0);
        const uint32_t rc = ToPos(doc, 1, &pos);
        antk::setContentReadHook(nullptr);
        EXPECT_FALSE(outside) << "every read gets the rest of the same buffer";
        EXPECT_EQ(rc, AN_OK);
        EXPECT_EQ(StateOf(doc)->mapCache[0].length, lie.length);
    }
}

TEST_F(MappingTest, AMapShorterThanItsChunkRefusesOrdinalsPastIt) {
    antk::DocumentBuilder b;
    const uint32_t item = b.textItem("abcdef");
    Doc doc(b.build());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::setContentReadHook([](CAReadRecord *r) {
        if (r->type == ANMOD_READ_TEXT) r->charCount = 4;
    });
    ANPos pos = Pos(0);
    ASSERT_EQ(ToPos(doc, 3, &pos), AN_OK);
    EXPECT_EQ(pos, Pos(item, 3));
    pos = Pos(9);
    EXPECT_EQ(ToPos(doc, 4, &pos), AN_ERR_NOTFOUND);
    EXPECT_EQ(ToPos(doc, 5, &pos), AN_ERR_NOTFOUND);
    EXPECT_EQ(pos, Pos(9));
    uint32_t ordinal = 0;
    ASSERT_EQ(ToOrdinal(doc, Pos(item, 5), &ordinal), AN_OK);
    EXPECT_EQ(ordinal, 0u) << "not in the map: the item's first character";
}

// ---- Failures ----------------------------------------------------------------------

TEST_F(MappingTest, ChunkerFailuresGiveTheDocumentedResults) {
    Sample s;
    const struct {
        Fn fn;
        uint64_t nth;
        uint32_t toPos;      // result of mapping ordinal 6
        bool written;        // whether pos was written
        uint32_t toOrdinal;  // result of mapping (ab, char 6) on a fresh state
        uint32_t ordinal;    // and the ordinal it gave
    } cases[] = {
        {Fn::CHGetItemId, 1, AN_ERR_NOTFOUND, false, AN_OK, 0},  // ordinal; reader's section
        {Fn::CHGetItemCountById, 1, AN_ERR_NOTFOUND, false, AN_ERR_BADARG, 999},
        {Fn::CHGetSectionInfo, 1, AN_OK, false, AN_OK, 0},  // a map without characters
        {Fn::CHGetRunFromItemId, 1, AN_OK, false, AN_ERR_NOTFOUND, 999},
        {Fn::CHGetRunInfo, 1, AN_OK, false, AN_ERR_NOTFOUND, 999},
        {Fn::CHGetRunInfo, 2, AN_OK, true, AN_OK, 0},  // the reader's run
        {Fn::CHGetItemId, 2, AN_OK, false, AN_OK, 6},  // the reader's section id
        {Fn::CHGetItem, 1, AN_OK, false, AN_OK, 0},    // the reader's section
        {Fn::CHGetItem, 2, AN_OK, true, AN_OK, 6},     // the item: taken as text
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(::testing::Message() << antk::fnName(c.fn) << " #" << c.nth);
        {
            Doc doc(BuildSample(&s));
            ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
            antk::failCall(c.fn, c.nth, 77);
            ANPos pos = Pos(9, 9, 9, 9);
            EXPECT_EQ(ToPos(doc, 6, &pos), c.toPos);
            EXPECT_EQ(pos, c.written ? Pos(s.ab, 6, 9, 9) : Pos(9, 9, 9, 9));
        }
        {
            Doc doc(BuildSample(&s));
            ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
            antk::failCall(c.fn, c.nth, 77);
            uint32_t ordinal = 999;
            EXPECT_EQ(ToOrdinal(doc, Pos(s.ab, 6), &ordinal), c.toOrdinal);
            EXPECT_EQ(ordinal, c.ordinal);
        }
    }
}

TEST_F(MappingTest, AnUnknownChunkStartIsNotCachedAndIsAskedAgain) {
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::CHGetItemCountById, 1, 77);
    ANPos pos = Pos(0);
    EXPECT_EQ(ToPos(doc, 8, &pos), AN_ERR_NOTFOUND);
    EXPECT_EQ(StateOf(doc)->mapCache[0].chunk, ANMAP_NO_CHUNK);
    ASSERT_EQ(ToPos(doc, 8, &pos), AN_OK);
    EXPECT_EQ(pos, Pos(s.xyz, 0x10001));
}

TEST_F(MappingTest, ContentThatCannotBeOpenedIsNotTriedAgain) {
    for (Fn fn : {Fn::DAOpenDocument, Fn::DASetOption, Fn::CAOpenContent}) {
        SCOPED_TRACE(antk::fnName(fn));
        Sample s;
        Doc doc(BuildSample(&s));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        antk::resetCalls();
        antk::failCall(fn, 1, 77);
        ANPos pos = Pos(9);
        EXPECT_EQ(ToPos(doc, 1, &pos), AN_ERR_NOSTATE);
        EXPECT_EQ(antk::openSecondaryDocuments(), 0) << "closed again";
        EXPECT_EQ(antk::openContents(), 0);
        EXPECT_EQ(StateOf(doc)->contentDoc, nullptr);
        EXPECT_EQ(StateOf(doc)->contentFailed & ANCONTENT_FAILED, 1u);
        EXPECT_EQ(antk::calls(Fn::CASeek), 0u);

        // Later maps are made without characters.
        EXPECT_EQ(ToPos(doc, 8, &pos), AN_OK);
        EXPECT_EQ(pos, Pos(9));
        uint32_t ordinal = 0;
        EXPECT_EQ(ToOrdinal(doc, Pos(s.pq, 0x10004), &ordinal), AN_OK);
        EXPECT_EQ(ordinal, 7u) << "the chunk's first ordinal";
        EXPECT_EQ(ToPos(doc, 1, &pos), AN_OK) << "chunk 0's map holds nothing";
        EXPECT_EQ(ToPos(doc, 2, &pos), AN_ERR_NOTFOUND) << "and is now the recent one";
        EXPECT_EQ(pos, Pos(9));
        EXPECT_EQ(antk::calls(Fn::DAOpenDocument), 1u);
        EXPECT_EQ(antk::calls(Fn::CAReadNext), 0u);
    }
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::DAOpenDocument, 1, 77);
    uint32_t ordinal = 999;
    EXPECT_EQ(ToOrdinal(doc, Pos(s.ab), &ordinal), AN_ERR_BADARG) << "position to ordinal";
    EXPECT_EQ(ordinal, 999u);
}

TEST_F(MappingTest, ContentReadFailuresLeaveWhatWasReadSoFar) {
    Sample s;
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::CAReadFirst, 1, 77);
    antk::failCall(Fn::CASeek, 1, 77);  // chunk 0 is where the rewind left the reader
    ANPos pos = Pos(0);
    ASSERT_EQ(ToPos(doc, 3, &pos), AN_OK);
    EXPECT_EQ(pos, Pos(s.hello, 3));

    antk::failCall(Fn::CAReadNext, 3, 77);  // chunk 1: the item "xyz" and the item "mid"
    ASSERT_EQ(ToPos(doc, 8, &pos), AN_OK);
    EXPECT_EQ(pos, Pos(s.xyz, 0x10001));
    EXPECT_EQ(ToPos(doc, 10, &pos), AN_ERR_NOTFOUND) << "past what was read";

    antk::failCall(Fn::CAReadNext, 1, 77);
    pos = Pos(9);
    EXPECT_EQ(ToPos(doc, 13, &pos), AN_OK) << "nothing read: nothing mapped";
    EXPECT_EQ(pos, Pos(9));
    uint32_t ordinal = 0;
    EXPECT_EQ(ToOrdinal(doc, Pos(s.last, 0x20001), &ordinal), AN_OK);
    EXPECT_EQ(ordinal, 12u);
}

TEST_F(MappingTest, OutOfMemoryGives13LeaksNothingAndIsRetried) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    Sample s;
    uint64_t count = 0;
    {
        Doc doc(BuildSample(&s));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        ANPos pos = Pos(0);
        anwin::resetCounters();
        ASSERT_EQ(ToPos(doc, 8, &pos), AN_OK);
        count = anwin::allocations();
    }
    ASSERT_EQ(count, 2u) << "the map and the scratch buffer";
    for (uint64_t n = 1; n <= count; ++n) {
        SCOPED_TRACE(n);
        Doc doc(BuildSample(&s));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        const int64_t blocks = anwin::globalBlocks();
        ANPos pos = Pos(0);
        ASSERT_EQ(ToPos(doc, 0, &pos), AN_OK);  // chunk 0 cached; chunk 1 fails
        anwin::failAllocation(n);
        pos = Pos(9);
        EXPECT_EQ(ToPos(doc, 8, &pos), AN_ERR_NOMEM);
        EXPECT_EQ(pos, Pos(9));
        EXPECT_EQ(anwin::globalBlocks(), blocks + 1) << "only chunk 0's map is left";
        anwin::failAllocation(n);
        uint32_t ordinal = 999;
        EXPECT_EQ(ToOrdinal(doc, Pos(s.pq), &ordinal), AN_ERR_BADARG);
        anwin::clearFailures();
        ASSERT_EQ(ToPos(doc, 8, &pos), AN_OK) << "a later call tries again";
        EXPECT_EQ(pos, Pos(s.xyz, 0x10001));
        antk::resetCalls();
        ASSERT_EQ(ToPos(doc, 0, &pos), AN_OK);
        EXPECT_EQ(antk::calls(Fn::CASeek), 0u) << "chunk 0 was kept cached";
    }
#endif
}

TEST_F(MappingTest, ABlockThatCannotBeLockedGives15) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    Sample s;
    for (uint64_t n : {1u, 2u}) {  // the map, then the scratch buffer, while reading
        SCOPED_TRACE(n);
        Doc doc(BuildSample(&s));
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
        const int64_t blocks = anwin::globalBlocks();
        anwin::failGlobalLock(n);
        ANPos pos = Pos(9);
        EXPECT_EQ(ToPos(doc, 1, &pos), AN_ERR_BADARG);
        EXPECT_EQ(pos, Pos(9));
        EXPECT_EQ(anwin::globalBlocks(), blocks);
        EXPECT_EQ(anwin::globalLocks(), 0);
        ASSERT_EQ(ToPos(doc, 1, &pos), AN_OK) << "tried again";
        EXPECT_EQ(pos, Pos(s.hello, 1));
    }
    Doc doc(BuildSample(&s));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ANPos pos = Pos(0);
    ASSERT_EQ(ToPos(doc, 1, &pos), AN_OK);
    anwin::failGlobalLock(1);  // a cached map
    pos = Pos(9);
    EXPECT_EQ(ToPos(doc, 2, &pos), AN_ERR_BADARG);
    EXPECT_EQ(pos, Pos(9));
    anwin::failGlobalLock(1);
    uint32_t ordinal = 999;
    EXPECT_EQ(ToOrdinal(doc, Pos(s.hello, 2), &ordinal), AN_ERR_BADARG);
    EXPECT_EQ(ordinal, 999u);
    EXPECT_EQ(anwin::globalLocks(), 0);
#endif
}

}  // namespace
