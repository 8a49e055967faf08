// Hostile callers: null handles and pointers, documents without annotation state, every
// size a sized record can claim, annotation types outside 1 to 7, clear and find modes
// with undefined bits. Each gets the result its contract gives, or a plain refusal
// with nothing changed; none crashes or reads past what the caller gave.
#include <gtest/gtest.h>

#include <functional>
#include <set>
#include <string>
#include <vector>

#include "anno/toolkit.h"
#include "hostile/hostile_support.h"

namespace {

using annotest::Pos;
using annotest::TextPos;
using hostile::Snapshot;
using hostile::Tried;

// The caller records a case may pass; filled with a pattern before each case so
// that a write to any of them shows.
struct Records {
    ANPos pos{};
    ANPos next{};
    ANTrackInfo track{};
    ANAnnoTextTrack text{};
    ANHiliteStyle style{};
    ANFindRecord find{};
    ANMapRecord map{};
    uint16_t unit = 0;
    ANStyleTable *table = nullptr;

    void Fill() {
        std::memset(this, 0xA5, sizeof *this);
        pos = Pos(2);
        style = ANHiliteStyle{ANHILITESTYLE_SIZE, 9, 0, 0, 0, 0, 0, 0};
        find = ANFindRecord{};
        find.size = ANFINDRECORD_SIZE;
        find.mode = ANFIND_FIRST | ANFIND_MASK;
        map = ANMapRecord{};
        map.size = ANMAPRECORD_SIZE;
        map.flags = ANMAP_POS_TO_ORDINAL;
        map.pos = Pos(2);
        text = ANAnnoTextTrack{};  // not started
    }
};

class HostileCalls : public hostile::HostileTest {
 protected:
    void SetUp() override {
        hostile::HostileTest::SetUp();
        empty_ = hostile::HostileDocument();
        ASSERT_EQ(ANInit(empty_, nullptr, nullptr, nullptr), AN_OK);
    }
    void TearDown() override {
        EXPECT_EQ(ANDeInit(empty_), AN_OK);
        antk::destroyDocument(empty_);
        hostile::HostileTest::TearDown();
    }
    DAHandle empty_ = nullptr;  // annotation state without a table
};

// One row: an export, what is wrong with its input, and the result it must give.
struct Row {
    const char *fn;
    const char *input;
    std::function<uint32_t(Records &)> call;
    uint32_t expect;
    bool writes = false;  // may write the caller's records
};

TEST_F(HostileCalls, EveryExportAnswersNullPointersAndMissingStateAsItsContractSays) {
    DAHandle doc = doc_;
    DAHandle bare = bare_;
    DAHandle empty = empty_;
    DAHandle noChunker = noChunker_;
    ANStyleTable *global = global_;
    const ANPos text = TextPos(hostile::kTextAnchorItem, ANPOS_NOSUBITEM, 0);
    std::vector<Row> rows = {
        {"ANInit", "null doc", [](Records &) { return ANInit(nullptr, nullptr, nullptr, nullptr); },
         AN_OK},
        {"ANInit", "doc without chunker",
         [=](Records &) { return ANInit(noChunker, nullptr, nullptr, nullptr); }, AN_OK},
        {"ANDeInit", "null doc", [](Records &) { return ANDeInit(nullptr); }, AN_ERR_BADARG},
        {"ANDeInit", "no state", [=](Records &) { return ANDeInit(bare); }, AN_OK},
        {"ANSetCallback", "null doc",
         [](Records &) { return ANSetCallback(nullptr, nullptr, nullptr); }, AN_ERR_BADARG},
        {"ANSetCallback", "no state",
         [=](Records &) { return ANSetCallback(bare, nullptr, nullptr); }, AN_ERR_NOSTATE},
        {"ANAddAnno", "null doc",
         [](Records &) {
             ANAnnoRecord d{};
             d.size = AN_RECORD_SIZE_POINT;
             return ANAddAnno(nullptr, AN_TYPE_POINT, &d);
         },
         AN_ERR_BADARG},
        {"ANAddAnno", "no state",
         [=](Records &) {
             ANAnnoRecord d{};
             d.size = AN_RECORD_SIZE_POINT;
             return ANAddAnno(bare, AN_TYPE_POINT, &d);
         },
         AN_ERR_NOSTATE},
        {"ANAddAnno", "type-5 text of 3 units at a null pointer",
         [=](Records &) {
             ANTextDesc d{};
             d.size = sizeof d;
             d.pos = Pos(2);
             d.textLength = 3;
             return ANAddAnno(doc, AN_TYPE_TEXT, &d);
         },
         AN_ERR_BADARG},
        {"ANClearAnnos", "null doc", [](Records &) { return ANClearAnnos(nullptr, 0, 0); },
         AN_ERR_BADARG},
        {"ANClearAnnos", "no state", [=](Records &) { return ANClearAnnos(bare, 0, 0); },
         AN_ERR_NOSTATE},
        {"ANClearAnnos", "no table", [=](Records &) { return ANClearAnnos(empty, 0, 0); }, AN_OK},
        {"ANClearUserData", "null doc", [](Records &) { return ANClearUserData(nullptr); },
         AN_ERR_BADARG},
        {"ANClearUserData", "no state", [=](Records &) { return ANClearUserData(bare); }, AN_OK},
        {"ANCopyAnnos", "null source", [=](Records &) { return ANCopyAnnos(doc, nullptr); },
         AN_ERR_BADARG},
        {"ANCopyAnnos", "null destination", [=](Records &) { return ANCopyAnnos(nullptr, doc); },
         AN_ERR_BADARG},
        {"ANCopyAnnos", "source without state", [=](Records &) { return ANCopyAnnos(doc, bare); },
         AN_ERR_NOSTATE},
        {"ANCopyAnnos", "destination without state",
         [=](Records &) { return ANCopyAnnos(bare, doc); }, AN_ERR_NOSTATE},
        {"ANCopyAnnos", "source without table, null destination",
         [=](Records &) { return ANCopyAnnos(nullptr, empty); }, AN_OK},
        {"ANCopyAnnos", "onto itself", [=](Records &) { return ANCopyAnnos(doc, doc); }, AN_OK},
        {"ANBuildAnnos", "null doc", [](Records &) { return ANBuildAnnos(nullptr); },
         AN_ERR_BADARG},
        {"ANBuildAnnos", "no state", [=](Records &) { return ANBuildAnnos(bare); }, AN_ERR_NOSTATE},
        {"ANBuildAnnos", "no ranges", [=](Records &) { return ANBuildAnnos(doc); }, AN_OK},
        {"ANCompPos", "the same record twice",
         [](Records &r) { return static_cast<uint32_t>(ANCompPos(&r.pos, &r.pos)); }, 0},
        {"ANIsAnnoTextPos", "kind 0xFFFFFFFF",
         [](Records &) {
             const ANPos p{1, 2, 0xFFFFFFFF, 3};
             return ANIsAnnoTextPos(&p);
         },
         0},
        {"ANNextPos", "null doc", [](Records &r) { return ANNextPos(nullptr, &r.pos, &r.next); },
         AN_ERR_NOTFOUND},
        {"ANNextPos", "no state", [=](Records &r) { return ANNextPos(bare, &r.pos, &r.next); },
         AN_ERR_NOTFOUND},
        {"ANNextPos", "null position", [=](Records &r) { return ANNextPos(doc, nullptr, &r.next); },
         AN_ERR_NOTFOUND},
        {"ANNextPos", "null result", [=](Records &r) { return ANNextPos(doc, &r.pos, nullptr); },
         AN_ERR_NOTFOUND},
        {"ANNextChunkerPos", "null doc",
         [](Records &r) { return ANNextChunkerPos(nullptr, &r.pos, &r.next); }, AN_ERR_BADARG,
         true},
        {"ANNextChunkerPos", "null doc, annotation text",
         [=](Records &r) { return ANNextChunkerPos(nullptr, &text, &r.next); }, AN_OK, true},
        {"ANNextChunkerPos", "no state",
         [=](Records &r) { return ANNextChunkerPos(bare, &r.pos, &r.next); }, AN_ERR_NOSTATE, true},
        {"ANNextChunkerPos", "null position",
         [=](Records &r) { return ANNextChunkerPos(doc, nullptr, &r.next); }, AN_ERR_BADARG},
        {"ANNextChunkerPos", "null result",
         [=](Records &r) { return ANNextChunkerPos(doc, &r.pos, nullptr); }, AN_ERR_BADARG},
        {"ANNextAnnoTextPos", "null doc",
         [](Records &r) { return ANNextAnnoTextPos(nullptr, &r.pos, &r.next); }, AN_ERR_BADARG},
        {"ANNextAnnoTextPos", "no state",
         [=](Records &r) { return ANNextAnnoTextPos(bare, &r.pos, &r.next); }, AN_ERR_NOSTATE},
        {"ANNextAnnoTextPos", "null position",
         [=](Records &r) { return ANNextAnnoTextPos(doc, nullptr, &r.next); }, AN_ERR_BADARG},
        {"ANNextAnnoTextPos", "null result",
         [=](Records &r) { return ANNextAnnoTextPos(doc, &r.pos, nullptr); }, AN_ERR_BADARG},
        {"ANMapPosition", "null doc", [](Records &r) { return ANMapPosition(nullptr, &r.map); },
         AN_ERR_BADARG},
        {"ANMapPosition", "no state", [=](Records &r) { return ANMapPosition(bare, &r.map); },
         AN_ERR_NOSTATE},
        {"ANMapPosition", "null record", [=](Records &) { return ANMapPosition(doc, nullptr); },
         AN_ERR_BADARG},
        {"ANInitGlobalHiliteStyles", "null handle pointer",
         [](Records &) { return ANInitGlobalHiliteStyles(nullptr); }, AN_ERR_BADARG},
        {"ANDeInitGlobalHiliteStyles", "null table",
         [](Records &) { return ANDeInitGlobalHiliteStyles(nullptr); }, AN_ERR_BADARG},
        {"ANGetGlobalHiliteStyle", "null table",
         [](Records &r) { return ANGetGlobalHiliteStyle(nullptr, 7, &r.style); }, AN_ERR_BADARG},
        {"ANGetGlobalHiliteStyle", "null record",
         [=](Records &) { return ANGetGlobalHiliteStyle(global, 7, nullptr); }, AN_OK},
        {"ANGetGlobalHiliteStyle", "unknown id",
         [=](Records &r) { return ANGetGlobalHiliteStyle(global, 0xFFFFFFFF, &r.style); },
         AN_ERR_NOTFOUND},
        {"ANAddGlobalHiliteStyle", "null table",
         [](Records &r) { return ANAddGlobalHiliteStyle(nullptr, &r.style); }, AN_ERR_BADARG},
        {"ANAddGlobalHiliteStyle", "null record",
         [=](Records &) { return ANAddGlobalHiliteStyle(global, nullptr); }, AN_ERR_BADARG},
        {"ANGetHiliteStyle", "null doc",
         [](Records &r) { return ANGetHiliteStyle(nullptr, 7, &r.style); }, 0},
        {"ANGetHiliteStyle", "no state",
         [=](Records &r) { return ANGetHiliteStyle(bare, 7, &r.style); }, 0},
        {"ANGetHiliteStyle", "null record",
         [=](Records &) { return ANGetHiliteStyle(doc, 7, nullptr); }, 1},
        {"ANAddHiliteStyle", "null doc",
         [](Records &r) { return ANAddHiliteStyle(nullptr, &r.style); }, AN_ERR_BADARG},
        {"ANAddHiliteStyle", "no state",
         [=](Records &r) { return ANAddHiliteStyle(bare, &r.style); }, AN_ERR_NOSTATE},
        {"ANAddHiliteStyle", "null record",
         [=](Records &) { return ANAddHiliteStyle(doc, nullptr); }, AN_ERR_BADARG},
        {"ANStartAnnoTrack", "null doc",
         [](Records &r) { return ANStartAnnoTrack(nullptr, &r.pos, &r.track); }, ANTRACK_NONE},
        {"ANStartAnnoTrack", "no state",
         [=](Records &r) { return ANStartAnnoTrack(bare, &r.pos, &r.track); }, ANTRACK_NONE},
        {"ANStartAnnoTrack", "null start",
         [=](Records &r) { return ANStartAnnoTrack(doc, nullptr, &r.track); }, ANTRACK_NONE},
        {"ANStartAnnoTrack", "null record",
         [=](Records &r) { return ANStartAnnoTrack(doc, &r.pos, nullptr); }, ANTRACK_NONE},
        {"ANEndAnnoTrack", "null doc and record",
         [](Records &) { return ANEndAnnoTrack(nullptr, nullptr); }, 0},
        {"ANTrackAnno", "null doc",
         [](Records &r) { return ANTrackAnno(nullptr, &r.pos, &r.track); }, 0},
        {"ANTrackAnno", "no state", [=](Records &r) { return ANTrackAnno(bare, &r.pos, &r.track); },
         0},
        {"ANStartAnnoTextTrack", "null record",
         [=](Records &) { return ANStartAnnoTextTrack(doc, nullptr); }, AN_ERR_BADARG},
        {"ANStartAnnoTextTrack", "null doc (not read)",
         [](Records &r) {
             const uint32_t rc = ANStartAnnoTextTrack(nullptr, &r.text);
             ANEndAnnoTextTrack(nullptr, &r.text);
             return rc;
         },
         AN_OK, true},
        {"ANEndAnnoTextTrack", "null record",
         [=](Records &) { return ANEndAnnoTextTrack(doc, nullptr); }, AN_OK},
        {"ANEndAnnoTextTrack", "never started",
         [](Records &r) { return ANEndAnnoTextTrack(nullptr, &r.text); }, AN_OK},
        {"ANAnnoEvent", "null doc", [](Records &r) { return ANAnnoEvent(nullptr, 1, 0, &r.pos); },
         0},
        {"ANAnnoEvent", "no state", [=](Records &r) { return ANAnnoEvent(bare, 1, 0, &r.pos); }, 0},
        {"ANAnnoEvent", "null position", [=](Records &) { return ANAnnoEvent(doc, 1, 0, nullptr); },
         0},
        {"ANAnnoEvent", "move with a null position",
         [=](Records &) { return ANAnnoEvent(doc, ANEVENT_MOVE, 0, nullptr); }, 0},
        {"ANGetAnnoText", "null doc",
         [](Records &r) { return ANGetAnnoText(nullptr, &r.text, &r.pos, &r.unit); },
         AN_ERR_BADARG},
        {"ANGetAnnoText", "no state, track never started",
         [=](Records &r) { return ANGetAnnoText(bare, &r.text, &text, &r.unit); }, AN_ERR_BADARG},
        {"ANGetAnnoText", "track never started",
         [=](Records &r) { return ANGetAnnoText(doc, &r.text, &text, &r.unit); }, AN_ERR_BADARG},
        {"ANGetAnnoText", "null track",
         [=](Records &r) { return ANGetAnnoText(doc, nullptr, &text, &r.unit); }, AN_ERR_BADARG},
        {"ANGetAnnoText", "null position",
         [=](Records &r) {
             ANAnnoTextTrack t{};
             ANStartAnnoTextTrack(doc, &t);
             const uint32_t rc = ANGetAnnoText(doc, &t, nullptr, &r.unit);
             ANEndAnnoTextTrack(doc, &t);
             return rc;
         },
         AN_ERR_BADARG},
        {"ANGetAnnoText", "null unit",
         [=](Records &) {
             ANAnnoTextTrack t{};
             ANStartAnnoTextTrack(doc, &t);
             const uint32_t rc = ANGetAnnoText(doc, &t, &text, nullptr);
             ANEndAnnoTextTrack(doc, &t);
             return rc;
         },
         AN_ERR_BADARG},
        {"ANGetAnnoText", "no state, started track",
         [=](Records &r) {
             ANAnnoTextTrack t{};
             ANStartAnnoTextTrack(doc, &t);
             const uint32_t rc = ANGetAnnoText(bare, &t, &text, &r.unit);
             ANEndAnnoTextTrack(doc, &t);
             return rc;
         },
         AN_ERR_NOSTATE},
        {"ANGetAnnoText", "track already ended",
         [=](Records &r) {
             ANAnnoTextTrack t{};
             ANStartAnnoTextTrack(doc, &t);
             ANEndAnnoTextTrack(doc, &t);
             return ANGetAnnoText(doc, &t, &text, &r.unit);
         },
         AN_ERR_BADARG},
        {"ANFindAnno", "null doc", [](Records &r) { return ANFindAnno(nullptr, 0, &r.find); },
         AN_ERR_BADARG},
        {"ANFindAnno", "no state", [=](Records &r) { return ANFindAnno(bare, 0, &r.find); },
         AN_ERR_NOSTATE},
        {"ANFindAnno", "null record", [=](Records &) { return ANFindAnno(doc, 0, nullptr); },
         AN_ERR_BADARG},
        {"ANFindAnno", "no table", [=](Records &r) { return ANFindAnno(empty, 0, &r.find); },
         AN_ERR_NOTFOUND},
    };

    std::set<std::string> covered;
    for (const Row &row : rows) {
        SCOPED_TRACE(std::string(row.fn) + ": " + row.input);
        const Snapshot docBefore = Snapshot::Of(doc_);
        const Snapshot bareBefore = Snapshot::Of(bare_);
        const Snapshot emptyBefore = Snapshot::Of(empty_);
        const size_t notified = notes_.calls.size();
        Records records;
        records.Fill();
        Records pattern;
        pattern.Fill();
        EXPECT_EQ(Tried(row.call(records)), row.expect);
        EXPECT_TRUE(Snapshot::Of(doc_) == docBefore) << "the document changed";
        EXPECT_TRUE(Snapshot::Of(bare_) == bareBefore) << "the document without state changed";
        EXPECT_TRUE(Snapshot::Of(empty_) == emptyBefore) << "the document without table changed";
        EXPECT_EQ(antk::annoSlot(noChunker_), nullptr);
        EXPECT_EQ(notes_.calls.size(), notified) << "the callback was called";
        if (!row.writes) {
            EXPECT_EQ(std::memcmp(&records, &pattern, sizeof records), 0)
                << "a caller record was written";
        }
        covered.insert(row.fn);
    }
    EXPECT_EQ(covered.size(), 28u) << "every export has its rows";
}

TEST_F(HostileCalls, AddingRefusesTypesOutsideOneToSevenAndNullDescriptors) {
    const Snapshot before = Snapshot::Of(doc_);
    ANAnnoRecord d{};
    d.size = AN_RECORD_SIZE_POINT;
    d.start = Pos(2);
    d.end = Pos(3);
    for (uint32_t type = 0; type <= 0xFFFF; ++type) {
        if (type >= AN_TYPE_HILITE && type <= AN_TYPE_CUTMARK) {
            ASSERT_EQ(Tried(ANAddAnno(doc_, static_cast<uint16_t>(type), nullptr)), AN_ERR_BADARG);
            continue;
        }
        ASSERT_EQ(Tried(ANAddAnno(doc_, static_cast<uint16_t>(type), &d)), AN_ERR_BADARG) << type;
        ASSERT_EQ(Tried(ANAddAnno(doc_, static_cast<uint16_t>(type), nullptr)), AN_ERR_BADARG);
        if (type % 4096 == 0) {
            ASSERT_TRUE(Snapshot::Of(doc_) == before) << "type " << type;
        }
    }
    EXPECT_TRUE(Snapshot::Of(doc_) == before);
    EXPECT_TRUE(notes_.calls.empty());
}

// Descriptors of every size from 0 to 128 bytes, each in a block of exactly that size:
// the sizes a type takes add it, every other size is refused with nothing changed.
TEST_F(HostileCalls, AddingTakesOnlyTheDescriptorSizesOfEachType) {
    const std::vector<std::set<uint32_t>> accepted = {
        {}, {72, 60, 48}, {72, 64, 32}, {48, 44, 40}, {72, 64}, {48}, {32, 28}, {32, 28}};
    for (uint16_t type = AN_TYPE_HILITE; type <= AN_TYPE_CUTMARK; ++type) {
        // A model that every form reads sensibly: a tag, positions on plain items,
        // and zero for userData, texts and lengths.
        uint8_t model[136] = {};
        const uint32_t tag = 0x700 + type;
        const ANPos at = type == AN_TYPE_RANGE ? Pos(13) : Pos(14);
        std::memcpy(model + 4, &tag, 4);
        std::memcpy(model + 8, &at, sizeof at);
        const ANPos end = Pos(15);
        std::memcpy(model + 24, &end, sizeof end);
        for (uint32_t size = 0; size <= 128; ++size) {
            SCOPED_TRACE("type " + std::to_string(type) + ", size " + std::to_string(size));
            hostile::SizedRecord record(size, model, sizeof model);
            const Snapshot before = Snapshot::Of(doc_);
            const size_t notified = notes_.calls.size();
            const uint32_t rc = Tried(ANAddAnno(doc_, type, record.get()));
            EXPECT_TRUE(record.unchanged()) << "the descriptor was written";
            if (accepted[type].count(size) != 0) {
                EXPECT_EQ(rc, AN_OK);
                EXPECT_EQ(notes_.calls.size(), notified + 1);
            } else {
                EXPECT_EQ(rc, AN_ERR_BADARG);
                EXPECT_TRUE(Snapshot::Of(doc_) == before)
                    << "a refused descriptor changed the table";
                EXPECT_EQ(notes_.calls.size(), notified);
            }
            ASSERT_TRUE(annotest::TableInvariantsHold(doc_));
        }
    }
}

TEST_F(HostileCalls, StyleTablesTakeOnlyTheTwoStyleRecordSizes) {
    ANHiliteStyle model{ANHILITESTYLE_SIZE, 40, ANSTYLE_COLOR1, 0x123456, 0x654321, 3, 4, 5};
    for (uint32_t size = 0; size <= 128; ++size) {
        SCOPED_TRACE("size " + std::to_string(size));
        model.styleId = 40 + size;
        const bool taken = size == ANHILITESTYLE_SIZE || size == ANHILITESTYLE_SIZE_OLD;
        const Snapshot before = Snapshot::Of(doc_);
        hostile::SizedRecord forDoc(size, &model, sizeof model);
        EXPECT_EQ(Tried(ANAddHiliteStyle(doc_, static_cast<const ANHiliteStyle *>(forDoc.get()))),
                  taken ? AN_OK : AN_ERR_BADARG);
        EXPECT_TRUE(forDoc.unchanged());
        if (!taken) {
            EXPECT_TRUE(Snapshot::Of(doc_) == before);
        }

        const std::vector<ANHiliteStyle> globalBefore = hostile::StylesOf(global_);
        hostile::SizedRecord forGlobal(size, &model, sizeof model);
        EXPECT_EQ(Tried(ANAddGlobalHiliteStyle(
                      global_, static_cast<const ANHiliteStyle *>(forGlobal.get()))),
                  taken ? AN_OK : AN_ERR_BADARG);
        EXPECT_TRUE(forGlobal.unchanged());
        if (!taken) {
            EXPECT_EQ(hostile::StylesOf(global_).size(), globalBefore.size());
        }
        if (taken) {
            ANHiliteStyle got{};
            EXPECT_EQ(ANGetGlobalHiliteStyle(global_, model.styleId, &got), AN_OK);
            EXPECT_EQ(got.size, ANHILITESTYLE_SIZE);
            EXPECT_EQ(got.attr2, size == ANHILITESTYLE_SIZE ? 4 : 0xFFFF);
        }
    }
}

TEST_F(HostileCalls, FindingAndMappingTakeOnlyTheirRecordSize) {
    ANFindRecord find{};
    find.mode = ANFIND_FIRST | ANFIND_MASK;
    ANMapRecord map{};
    map.flags = ANMAP_ORDINAL_TO_POS;
    map.ordinal = 2;
    for (uint32_t size = 0; size <= 128; ++size) {
        SCOPED_TRACE("size " + std::to_string(size));
        hostile::SizedRecord f(size, &find, sizeof find);
        EXPECT_EQ(Tried(ANFindAnno(doc_, 0, static_cast<ANFindRecord *>(f.get()))),
                  size == ANFINDRECORD_SIZE ? AN_OK : AN_ERR_BADARG);
        if (size != ANFINDRECORD_SIZE) {
            EXPECT_TRUE(f.unchanged());
        }

        hostile::SizedRecord m(size, &map, sizeof map);
        EXPECT_EQ(Tried(ANMapPosition(doc_, static_cast<ANMapRecord *>(m.get()))),
                  size == ANMAPRECORD_SIZE ? AN_OK : AN_ERR_BADARG);
        if (size != ANMAPRECORD_SIZE) {
            EXPECT_TRUE(m.unchanged());
        }
    }
}

// Bits other than the two selectors are ignored: with a value no tag matches, no clear
// but the unselective one (flags 0) removes anything; with a matching value, a stray
// bit does not change what the selector removes.
TEST_F(HostileCalls, ClearingIgnoresUndefinedFlagBits) {
    const Snapshot before = Snapshot::Of(doc_);
    for (uint32_t flags = 1; flags <= 0xFFFF; ++flags) {
        ASSERT_EQ(Tried(ANClearAnnos(doc_, static_cast<uint16_t>(flags), 0xFFFFFFFF)), AN_OK)
            << flags;
        if (flags % 1024 == 0) {
            ASSERT_TRUE(Snapshot::Of(doc_) == before) << flags;
        }
    }
    EXPECT_TRUE(Snapshot::Of(doc_) == before);
    EXPECT_TRUE(notes_.calls.empty());

    for (uint32_t bit = 1; bit <= 0x8000; bit <<= 1) {
        if (bit == ANCLEAR_MASK || bit == ANCLEAR_EQUAL) continue;
        for (const uint16_t selector : {uint16_t{ANCLEAR_EQUAL}, uint16_t{ANCLEAR_MASK}}) {
            SCOPED_TRACE("bit " + std::to_string(bit) + " with selector " +
                         std::to_string(selector));
            annotest::Doc plain(hostile::HostileDocument());
            annotest::Notifications notes;
            ASSERT_EQ(ANInit(plain, nullptr, &annotest::Notifications::Callback, &notes), AN_OK);
            for (const uint32_t tag : {1u, 2u, 3u, 6u, 0x80000002u}) {
                ASSERT_EQ(annotest::AddPoint(plain, Pos(tag % 16), tag), AN_OK);
            }
            notes.calls.clear();
            EXPECT_EQ(Tried(ANClearAnnos(plain, static_cast<uint16_t>(selector | bit), 2)), AN_OK);
            std::multiset<uint32_t> left;
            for (const annotest::Listed &e : annotest::ListedEntries(plain)) {
                left.insert(e.record.tag);
            }
            const std::multiset<uint32_t> expected =
                selector == ANCLEAR_EQUAL ? std::multiset<uint32_t>{1, 3, 6, 0x80000002}
                                          : std::multiset<uint32_t>{1};
            EXPECT_EQ(left, expected);
            EXPECT_TRUE(annotest::TableInvariantsHold(plain));
        }
    }
}

// Only the low 8 bits (the kind) and the two tag-test bits of the mode are read, and
// only bit 0 of the flags, by kind 4: every other bit leaves the answer as it was.
TEST_F(HostileCalls, FindingIgnoresUndefinedModeAndFlagBits) {
    auto find = [this](uint16_t flags, uint16_t mode, ANFindRecord *out) {
        *out = ANFindRecord{};
        out->size = ANFINDRECORD_SIZE;
        out->mode = mode;
        out->tag = 0;
        out->key = Pos(3);
        out->foundEnd = Pos(2);
        return Tried(ANFindAnno(doc_, flags, out));
    };
    const Snapshot before = Snapshot::Of(doc_);
    for (uint32_t mode = 0; mode <= 0xFFFF; ++mode) {
        const auto canonical =
            static_cast<uint16_t>(mode & (ANFIND_KINDMASK | ANFIND_MASK | ANFIND_EQUAL));
        ANFindRecord got{};
        ANFindRecord want{};
        const uint32_t rc = find(0, static_cast<uint16_t>(mode), &got);
        const uint32_t wantRc = find(0, canonical, &want);
        ASSERT_EQ(rc, wantRc) << "mode " << mode;
        got.mode = want.mode;
        ASSERT_EQ(std::memcmp(&got, &want, sizeof got), 0) << "mode " << mode;
        const uint32_t kind = mode & ANFIND_KINDMASK;
        if (kind < ANFIND_FIRST || kind > ANFIND_AT || (mode & (ANFIND_MASK | ANFIND_EQUAL)) == 0) {
            ASSERT_EQ(rc, AN_ERR_NOTFOUND) << "mode " << mode;
        }
    }
    for (uint32_t flags = 0; flags <= 0xFFFF; ++flags) {
        ANFindRecord got{};
        ANFindRecord want{};
        const uint32_t rc = find(static_cast<uint16_t>(flags), ANFIND_AFTER | ANFIND_MASK, &got);
        ASSERT_EQ(rc, find(flags & ANFIND_AFTER_PREVIOUS, ANFIND_AFTER | ANFIND_MASK, &want));
        ASSERT_EQ(std::memcmp(&got, &want, sizeof got), 0) << "flags " << flags;
    }
    EXPECT_TRUE(Snapshot::Of(doc_) == before);
}

}  // namespace
