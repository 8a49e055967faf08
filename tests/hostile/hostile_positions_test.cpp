// Hostile positions and indices: positions beyond the document's end and with every
// kind, slot indices beyond the table, event codes nobody defined, tracking and text
// tracking records never started or already ended, mapping records with stray flags.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "anno/toolkit.h"
#include "hostile/hostile_support.h"
#include "queries/queries.h"
#include "store/table.h"

namespace {

using annotest::Pos;
using annotest::TextPos;
using hostile::Snapshot;
using hostile::Tried;

std::string Str(const ANPos &p) { return ::testing::PrintToString(p); }

bool Same(const ANPos &a, const ANPos &b) { return std::memcmp(&a, &b, sizeof a) == 0; }

class HostilePositions : public hostile::HostileTest {
 protected:
    // Walks `doc` from `from` to its end, tracking and reading annotation text at every
    // position and finding from it; each call within its results, the walk moving on.
    static void WalkEverything(DAHandle doc, const ANPos &from) {
        ANTrackInfo track{};
        ANAnnoTextTrack text{};
        ASSERT_EQ(ANStartAnnoTextTrack(doc, &text), AN_OK);
        Tried(ANStartAnnoTrack(doc, &from, &track));
        ANPos p = from;
        uint32_t steps = 0;
        for (; steps < 5000; ++steps) {
            ASSERT_EQ(Tried(ANTrackAnno(doc, &p, &track)) & ~uint32_t{0x3F}, 0u) << Str(p);
            uint16_t unit = 0;
            const uint32_t got = Tried(ANGetAnnoText(doc, &text, &p, &unit));
            ASSERT_TRUE(got == ANTEXT_UNIT_FOUND || got == ANTEXT_PLACEHOLDER_FOUND ||
                        got == AN_ERR_NOTFOUND)
                << got;
            ANFindRecord find{};
            find.size = ANFINDRECORD_SIZE;
            find.mode = ANFIND_AT | ANFIND_MASK;
            find.key = p;
            const uint32_t found = Tried(ANFindAnno(doc, 0, &find));
            ASSERT_TRUE(found == AN_OK || found == AN_ERR_NOTFOUND) << found;
            ANPos next{};
            if (Tried(ANNextPos(doc, &p, &next)) != AN_OK) break;
            ASSERT_LT(ANCompPos(&p, &next), 0) << Str(p) << " to " << Str(next);
            p = next;
        }
        EXPECT_LT(steps, 5000u) << "the walk does not end";
        EXPECT_EQ(ANEndAnnoTextTrack(doc, &text), AN_OK);
    }
};

TEST_F(HostilePositions, ComparingGivesOneTotalOrderOverEveryKind) {
    const std::vector<ANPos> positions = hostile::HostilePositions();
    // A spread of partners; comparing every pair would add nothing but time.
    for (size_t i = 0; i < positions.size(); ++i) {
        const ANPos &a = positions[i];
        EXPECT_EQ(Tried(static_cast<uint32_t>(ANCompPos(&a, &a))), 0u) << Str(a);
        EXPECT_EQ(Tried(ANIsAnnoTextPos(&a)), a.kind == ANPOS_ANNOTEXT ? 1u : 0u) << Str(a);
        for (size_t j = i % 7; j < positions.size(); j += 37) {
            const ANPos &b = positions[j];
            const int16_t ab = ANCompPos(&a, &b);
            const int16_t ba = ANCompPos(&b, &a);
            Tried(0);
            ASSERT_TRUE(ab == -1 || ab == 0 || ab == 1) << Str(a) << " " << Str(b);
            ASSERT_EQ(ab, -ba) << Str(a) << " " << Str(b);
        }
    }
}

// Every stepping call from every position: a result its contract gives, a next
// position that sorts after the one it came from, and a walk that ends.
TEST_F(HostilePositions, SteppingFromAnyPositionMovesForwardOrStops) {
    for (const ANPos &p : hostile::HostilePositions()) {
        SCOPED_TRACE(Str(p));
        ANPos next{};
        uint32_t rc = Tried(ANNextChunkerPos(doc_, &p, &next));
        ASSERT_TRUE(rc == AN_OK || rc == AN_ERR_NOTFOUND) << rc;
        if (p.kind == ANPOS_ANNOTEXT) {
            EXPECT_EQ(rc, AN_OK);
            EXPECT_TRUE(Same(next, ANPos{p.itemId, p.subItemId, 0, 0})) << Str(next);
        }
        if (p.kind != ANPOS_ANNOTEXT && p.itemId > hostile::kLastItem) {
            EXPECT_EQ(rc, AN_ERR_NOTFOUND) << "an item beyond the document";
        }

        next = ANPos{};
        rc = Tried(ANNextAnnoTextPos(doc_, &p, &next));
        ASSERT_TRUE(rc == AN_OK || rc == AN_ERR_NOTFOUND) << rc;
        if (rc == AN_OK) {
            EXPECT_EQ(next.kind, ANPOS_ANNOTEXT);
            EXPECT_LT(ANCompPos(&p, &next), 0) << "to " << Str(next);
        }

        ANPos at = p;
        uint32_t steps = 0;
        for (; steps < 1000; ++steps) {
            rc = Tried(ANNextPos(doc_, &at, &next));
            ASSERT_TRUE(rc == AN_OK || rc == AN_ERR_NOTFOUND) << rc;
            if (rc != AN_OK) break;
            ASSERT_LT(ANCompPos(&at, &next), 0) << Str(at) << " to " << Str(next);
            at = next;
        }
        EXPECT_LT(steps, 1000u) << "the walk does not end";
    }
}

TEST_F(HostilePositions, QueriesAtAnyPositionAnswerWithinTheirResults) {
    const Snapshot before = Snapshot::Of(doc_);
    ANAnnoTextTrack text{};
    ASSERT_EQ(ANStartAnnoTextTrack(doc_, &text), AN_OK);
    for (const ANPos &p : hostile::HostilePositions()) {
        SCOPED_TRACE(Str(p));
        uint16_t unit = 0xABCD;
        const uint32_t got = Tried(ANGetAnnoText(doc_, &text, &p, &unit));
        ASSERT_TRUE(got == ANTEXT_UNIT_FOUND || got == ANTEXT_PLACEHOLDER_FOUND ||
                    got == AN_ERR_NOTFOUND)
            << got;
        if (got == AN_ERR_NOTFOUND) {
            EXPECT_EQ(unit, 0xABCD) << "a unit written for no text";
        }
        if (p.kind != ANPOS_ANNOTEXT) {
            EXPECT_EQ(got, AN_ERR_NOTFOUND);
        }

        for (uint16_t kind = ANFIND_FIRST; kind <= ANFIND_AT; ++kind) {
            for (const uint32_t tag : {0u, 1u, 0x80000000u}) {
                ANFindRecord find{};
                find.size = ANFINDRECORD_SIZE;
                find.mode = static_cast<uint16_t>(kind | ANFIND_MASK);
                find.tag = tag;
                find.key = p;
                find.foundEnd = p;
                const ANFindRecord untouched = find;
                const uint32_t rc = Tried(ANFindAnno(doc_, ANFIND_AFTER_PREVIOUS, &find));
                ASSERT_TRUE(rc == AN_OK || rc == AN_ERR_NOTFOUND) << rc;
                if (rc == AN_ERR_NOTFOUND) {
                    EXPECT_EQ(std::memcmp(&find, &untouched, sizeof find), 0);
                } else {
                    EXPECT_LE(ANCompPos(&find.foundStart, &find.foundEnd), 0);
                }
            }
        }

        ANMapRecord map{};
        map.size = ANMAPRECORD_SIZE;
        map.flags = ANMAP_POS_TO_ORDINAL;
        map.pos = p;
        map.ordinal = 0xDEAD;
        const ANMapRecord untouched = map;
        const uint32_t rc = Tried(ANMapPosition(doc_, &map));
        ASSERT_TRUE(rc == AN_OK || rc == AN_ERR_NOTFOUND) << rc;
        EXPECT_EQ(map.pos.kind, p.kind);
        EXPECT_EQ(map.pos.textIndex, p.textIndex);
        if (rc != AN_OK) {
            EXPECT_EQ(std::memcmp(&map, &untouched, sizeof map), 0);
        }
    }
    EXPECT_EQ(ANEndAnnoTextTrack(doc_, &text), AN_OK);
    EXPECT_TRUE(Snapshot::Of(doc_) == before);
    EXPECT_TRUE(notes_.calls.empty());
}

TEST_F(HostilePositions, TrackingFromAnyPositionReportsOnlyItsBits) {
    const Snapshot before = Snapshot::Of(doc_);
    const std::vector<ANPos> positions = hostile::HostilePositions();
    for (const ANPos &start : positions) {
        SCOPED_TRACE(Str(start));
        ANTrackInfo track{};
        const uint32_t state = Tried(ANStartAnnoTrack(doc_, &start, &track));
        ASSERT_TRUE(state == ANTRACK_NOMORE || state == ANTRACK_ACTIVE) << state;
        // Onwards from the start in the order the walk would visit them.
        for (size_t j = 0; j < positions.size(); j += 11) {
            if (ANCompPos(&positions[j], &start) < 0) continue;
            const uint32_t bits = Tried(ANTrackAnno(doc_, &positions[j], &track));
            ASSERT_EQ(bits & ~uint32_t{0x3F}, 0u) << Str(positions[j]);
        }
        EXPECT_EQ(Tried(ANEndAnnoTrack(doc_, &track)), 0u);
    }
    EXPECT_TRUE(Snapshot::Of(doc_) == before);
}

// Tracking records the caller never started, or filled with anything at all, or whose
// cursor names any slot: reading them never leaves the table.
TEST_F(HostilePositions, TrackingRecordsNeverStartedStayWithinTheTable) {
    const ANEntryTable *table = annotest::TableOf(doc_);
    ASSERT_NE(table, nullptr);
    const Snapshot before = Snapshot::Of(doc_);
    std::vector<ANTrackInfo> records;
    for (const int fill : {0x00, 0xFF, 0xA5, 0x5A, 0x01}) {
        ANTrackInfo t;
        std::memset(&t, fill, sizeof t);
        records.push_back(t);
    }
    for (uint32_t slot = 0; slot < table->capacity + 3u; ++slot) {
        for (const uint16_t hilite : {uint16_t{0}, static_cast<uint16_t>(slot), uint16_t{0x7777}}) {
            ANTrackInfo t{};
            t.cursor = static_cast<uint16_t>(slot);
            t.hiliteEntry = hilite;
            t.rangeActive = 1;
            t.markActive = 1;
            records.push_back(t);
        }
    }
    const std::vector<ANPos> positions = hostile::FewHostilePositions();
    for (ANTrackInfo &record : records) {
        for (const ANPos &p : positions) {
            ANTrackInfo t = record;
            const uint32_t bits = Tried(ANTrackAnno(doc_, &p, &t));
            ASSERT_EQ(bits & ~uint32_t{0x3F}, 0u);
            ASSERT_EQ(Tried(ANEndAnnoTrack(doc_, &t)), 0u);
            // Already ended: a record stays usable as it is.
            ASSERT_EQ(Tried(ANTrackAnno(doc_, &p, &t)) & ~uint32_t{0x3F}, 0u);
        }
    }
    EXPECT_TRUE(Snapshot::Of(doc_) == before);
}

TEST_F(HostilePositions, TextTracksNeverStartedOrEndedAreRefused) {
    const ANPos text = TextPos(hostile::kTextAnchorItem, ANPOS_NOSUBITEM, 0);
    uint16_t unit = 0x1234;
    ANAnnoTextTrack zero{};
    EXPECT_EQ(Tried(ANGetAnnoText(doc_, &zero, &text, &unit)), AN_ERR_BADARG);
    EXPECT_EQ(Tried(ANEndAnnoTextTrack(doc_, &zero)), AN_OK);
    EXPECT_EQ(Tried(ANEndAnnoTextTrack(doc_, &zero)), AN_OK);

    ANAnnoTextTrack track{};
    ASSERT_EQ(Tried(ANStartAnnoTextTrack(doc_, &track)), AN_OK);
    EXPECT_EQ(Tried(ANGetAnnoText(doc_, &track, &text, &unit)), ANTEXT_UNIT_FOUND);
    EXPECT_EQ(unit, u'a');
    EXPECT_EQ(Tried(ANEndAnnoTextTrack(doc_, &track)), AN_OK);
    unit = 0x1234;
    EXPECT_EQ(Tried(ANGetAnnoText(doc_, &track, &text, &unit)), AN_ERR_BADARG) << "ended";
    EXPECT_EQ(unit, 0x1234);
    EXPECT_EQ(Tried(ANEndAnnoTextTrack(doc_, &track)), AN_OK) << "ended twice";
    EXPECT_EQ(track.segs, nullptr);
}

// Slot indices from 0 to 65535 with every defined event and some undefined ones:
// an index that names no entry of the ordered list delivers nothing and leaves the
// hover state alone.
TEST_F(HostilePositions, EventsForSlotsBeyondTheTableDeliverNothing) {
    const ANEntryTable *table = annotest::TableOf(doc_);
    ASSERT_NE(table, nullptr);
    std::vector<bool> live(0x10000, false);
    for (const annotest::Listed &e : annotest::ListedEntries(doc_)) live[e.slot] = true;
    notes_.result = 7;
    const ANPos at = Pos(2);
    for (uint32_t entry = 0; entry <= 0xFFFF; ++entry) {
        for (const uint32_t event :
             {ANEVENT_CLICK1, ANEVENT_CLICK2, ANEVENT_CLICK3, ANEVENT_MOVE}) {
            const Snapshot before = Snapshot::Of(doc_);
            const size_t notified = notes_.calls.size();
            const uint32_t rc = Tried(ANAnnoEvent(doc_, event, static_cast<uint16_t>(entry), &at));
            if (entry != AN_NONE && !live[entry]) {
                ASSERT_EQ(rc, 0u) << "slot " << entry << ", event " << event;
                ASSERT_EQ(notes_.calls.size(), notified) << "slot " << entry;
                if (entry % 256 == 0) {
                    ASSERT_TRUE(Snapshot::Of(doc_) == before) << entry;
                }
            } else {
                ASSERT_TRUE(rc == 0 || rc == 7) << rc;
            }
        }
    }
    // Codes nobody defined deliver nothing, from any position.
    const Snapshot before = Snapshot::Of(doc_);
    const size_t notified = notes_.calls.size();
    for (uint32_t event = 0; event <= 0x100; ++event) {
        if (event == ANEVENT_CLICK1 || event == ANEVENT_CLICK2 || event == ANEVENT_CLICK3 ||
            event == ANEVENT_MOVE) {
            continue;
        }
        for (const ANPos &p : hostile::FewHostilePositions()) {
            ASSERT_EQ(Tried(ANAnnoEvent(doc_, event, table->first, &p)), 0u) << event;
        }
    }
    for (const uint32_t event : {0x80000000u, 0xFFFFFFFFu, 0x10010u}) {
        ASSERT_EQ(Tried(ANAnnoEvent(doc_, event, table->first, &at)), 0u) << event;
    }
    EXPECT_EQ(notes_.calls.size(), notified);
    EXPECT_TRUE(Snapshot::Of(doc_) == before);
}

TEST_F(HostilePositions, EventsAtAnyPositionKeepTheTableWhole) {
    const ANEntryTable *table = annotest::TableOf(doc_);
    ASSERT_NE(table, nullptr);
    for (const ANPos &p : hostile::HostilePositions()) {
        for (const uint32_t event : {ANEVENT_CLICK1, ANEVENT_MOVE}) {
            for (const uint16_t entry : {table->first, table->last, uint16_t{AN_NONE}}) {
                Tried(ANAnnoEvent(doc_, event, entry, &p));
            }
        }
    }
    for (const annotest::Notification &n : notes_.calls) {
        EXPECT_EQ(n.code, ANNOTIFY_EVENT);
        EXPECT_EQ(n.event.size, ANEVENTREC_SIZE);
    }
    EXPECT_TRUE(annotest::TableInvariantsHold(doc_));
}

TEST_F(HostilePositions, MappingIgnoresStrayFlagsAndRefusesOrdinalsBeyondTheEnd) {
    for (uint32_t bit = 0; bit < 32; ++bit) {
        for (const uint32_t base : {0u, ANMAP_ORDINAL_TO_POS, ANMAP_POS_TO_ORDINAL}) {
            const uint32_t flags = base | (1u << bit);
            ANMapRecord map{};
            map.size = ANMAPRECORD_SIZE;
            map.flags = flags;
            map.pos = Pos(hostile::kTextItem, 3);
            map.ordinal = 4;
            const ANMapRecord untouched = map;
            const uint32_t rc = Tried(ANMapPosition(doc_, &map));
            if ((flags & (ANMAP_ORDINAL_TO_POS | ANMAP_POS_TO_ORDINAL)) == 0) {
                EXPECT_EQ(rc, AN_ERR_BADARG) << "flags " << flags;
                EXPECT_EQ(std::memcmp(&map, &untouched, sizeof map), 0);
            } else {
                EXPECT_EQ(rc, AN_OK) << "flags " << flags;
            }
        }
    }
    for (const uint32_t ordinal :
         {0u, 1u, 6u, 7u, 8u, 100u, 0xFFFFu, 0x10000u, 0x7FFFFFFFu, 0xFFFFFFFEu, 0xFFFFFFFFu}) {
        ANMapRecord map{};
        map.size = ANMAPRECORD_SIZE;
        map.flags = ANMAP_ORDINAL_TO_POS;
        map.ordinal = ordinal;
        map.pos = ANPos{1, 2, 3, 4};
        const ANMapRecord untouched = map;
        const uint32_t rc = Tried(ANMapPosition(doc_, &map));
        // The document has 7 characters.
        EXPECT_EQ(rc, ordinal < 7 ? AN_OK : AN_ERR_NOTFOUND) << ordinal;
        EXPECT_EQ(map.pos.kind, 3u);
        EXPECT_EQ(map.pos.textIndex, 4u);
        if (rc != AN_OK) {
            EXPECT_EQ(std::memcmp(&map, &untouched, sizeof map), 0);
        }
    }
}

// Annotations of every type at positions beyond the document and with every kind,
// all in one document so that each meets the others (text shifting positions, ranges
// merging, placeholders splitting text); then cleared piece by piece. The table keeps
// its rules after every call; a refusal changes nothing; ranges end their walks.
TEST_F(HostilePositions, AddingAndClearingAtAnyPositionKeepsTheTableWhole) {
    const std::vector<ANPos> positions = hostile::FewHostilePositions();
    annotest::Doc doc(hostile::HostileDocument());
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    Annotate(doc);
    for (size_t i = 0; i < positions.size(); ++i) {
        const ANPos &p = positions[i];
        const ANPos &q = positions[(i * 7 + 3) % positions.size()];
        const auto tag = static_cast<uint32_t>(100 + i);
        for (uint16_t type = AN_TYPE_HILITE; type <= AN_TYPE_CUTMARK; ++type) {
            SCOPED_TRACE("type " + std::to_string(type) + " at " + Str(p) + " to " + Str(q));
            const Snapshot before = Snapshot::Of(doc);
            uint32_t rc = 0;
            switch (type) {
                case AN_TYPE_HILITE:
                    rc = annotest::AddHilite(doc, p, q, tag);
                    break;
                case AN_TYPE_RANGE:
                    rc = annotest::AddRange(doc, p, q, tag);
                    break;
                case AN_TYPE_TEXT:
                    rc = annotest::AddText(doc, p, u"hx", tag);
                    break;
                case AN_TYPE_PLACEHOLDER:
                    rc = annotest::AddPlaceholder(doc, p, tag);
                    break;
                case AN_TYPE_CUTMARK:
                    rc = annotest::AddCutMark(doc, p, tag);
                    break;
                default:
                    rc = annotest::AddPoint(doc, p, tag, 0, type);
                    break;
            }
            Tried(rc);
            // Text may be refused at a text position its anchor does not have.
            const bool text = type == AN_TYPE_TEXT || type == AN_TYPE_PLACEHOLDER;
            if (text && rc == AN_ERR_BADARG) {
                EXPECT_TRUE(Snapshot::Of(doc) == before);
            } else {
                EXPECT_EQ(rc, AN_OK);
            }
            ASSERT_TRUE(annotest::TableInvariantsHold(doc));
        }
    }
    // What the hostile table holds can be walked, tracked, read, searched and copied.
    annotest::Doc annotated(hostile::HostileDocument());
    annotest::Doc empty(hostile::HostileDocument());
    ASSERT_EQ(ANInit(annotated, nullptr, nullptr, nullptr), AN_OK);
    ASSERT_EQ(ANInit(empty, nullptr, nullptr, nullptr), AN_OK);
    Annotate(annotated);
    EXPECT_EQ(Tried(ANCopyAnnos(annotated, doc)), AN_OK);
    EXPECT_EQ(Tried(ANCopyAnnos(empty, doc)), AN_OK);
    EXPECT_EQ(annotest::ListedEntries(empty).size(), annotest::ListedEntries(doc).size());
    for (DAHandle d : {doc.get(), annotated.get(), empty.get()}) {
        ASSERT_TRUE(annotest::TableInvariantsHold(d));
        WalkEverything(d, Pos(0));
        WalkEverything(d, TextPos(3, ANPOS_NOSUBITEM, 0));
    }
    // Texts and placeholders go first, each position's at a time, then the rest.
    for (size_t i = 0; i < positions.size(); ++i) {
        const auto tag = static_cast<uint32_t>(100 + i);
        SCOPED_TRACE("clearing tag " + std::to_string(tag));
        EXPECT_EQ(Tried(ANClearAnnos(doc, ANCLEAR_EQUAL, tag)), AN_OK);
        ASSERT_TRUE(annotest::TableInvariantsHold(doc));
    }
    EXPECT_EQ(Tried(ANClearAnnos(doc, ANCLEAR_MASK, 0)), AN_OK);
    EXPECT_EQ(annotest::TableOf(doc), nullptr);
}

// Text indices no anchor's text reaches, given by a caller: text inserted or removed
// before them moves them without wrapping round below the indices they sorted after,
// and annotation text is refused there.
TEST_F(HostilePositions, TextIndicesAtTheTopOfTheRangeNeverWrap) {
    constexpr uint32_t kTop = 0xFFFFFFFF;
    const uint32_t a = hostile::kTextAnchorItem;
    const ANPos top = TextPos(a, ANPOS_NOSUBITEM, kTop);
    // A range into the top, points at and next to it, also at another anchor.
    ASSERT_EQ(Tried(annotest::AddHilite(doc_, TextPos(a, ANPOS_NOSUBITEM, 2), top, 60)), AN_OK);
    ASSERT_EQ(Tried(annotest::AddPoint(doc_, TextPos(a, ANPOS_NOSUBITEM, kTop - 1), 61)), AN_OK);
    ASSERT_EQ(Tried(annotest::AddPoint(doc_, top, 62)), AN_OK);
    ASSERT_EQ(Tried(annotest::AddCutMark(doc_, top, 63)), AN_OK);
    ASSERT_EQ(Tried(annotest::AddPoint(doc_, TextPos(3, ANPOS_NOSUBITEM, kTop), 64)), AN_OK);
    EXPECT_TRUE(annotest::TableInvariantsHold(doc_));
    for (const annotest::Listed &e : annotest::ListedEntries(doc_)) {
        if (e.record.tag == 62 || e.record.tag == 63) {
            EXPECT_TRUE(Same(e.record.start, top)) << "a point at the top stays there";
        }
    }
    // Annotation text has no unit there, nor at a character whose next one wraps.
    Snapshot before = Snapshot::Of(doc_);
    EXPECT_EQ(Tried(annotest::AddText(doc_, top, u"t", 65)), AN_ERR_BADARG);
    EXPECT_EQ(Tried(annotest::AddPlaceholder(doc_, top, 65)), AN_ERR_BADARG);
    EXPECT_EQ(Tried(annotest::AddText(doc_, Pos(a, 0xFFFFFFFE), u"t", 65)), AN_ERR_BADARG);
    EXPECT_EQ(Tried(annotest::AddPlaceholder(doc_, Pos(a, 0xFFFFFFFE), 65)), AN_ERR_BADARG);
    EXPECT_TRUE(Snapshot::Of(doc_) == before);

    // Text, a placeholder splitting it, and both removed again, at the anchor.
    ASSERT_EQ(Tried(annotest::AddText(doc_, TextPos(a, ANPOS_NOSUBITEM, 1), u"xyz", 66)), AN_OK);
    EXPECT_TRUE(annotest::TableInvariantsHold(doc_));
    ASSERT_EQ(Tried(annotest::AddPlaceholder(doc_, TextPos(a, ANPOS_NOSUBITEM, 2), 67)), AN_OK);
    EXPECT_TRUE(annotest::TableInvariantsHold(doc_));
    for (const uint32_t tag : {67u, 66u, 6u}) {
        EXPECT_EQ(Tried(ANClearAnnos(doc_, ANCLEAR_EQUAL, tag)), AN_OK);
        EXPECT_TRUE(annotest::TableInvariantsHold(doc_)) << "after clearing " << tag;
    }
    // Text at another anchor, before the point at the top there.
    ASSERT_EQ(Tried(annotest::AddText(doc_, Pos(3), u"abc", 68)), AN_OK);
    ASSERT_EQ(Tried(annotest::AddText(doc_, TextPos(3, ANPOS_NOSUBITEM, 0), u"d", 69)), AN_OK);
    EXPECT_EQ(Tried(ANClearAnnos(doc_, ANCLEAR_EQUAL, 68)), AN_OK);
    EXPECT_TRUE(annotest::TableInvariantsHold(doc_));
    EXPECT_EQ(Tried(ANClearAnnos(doc_, 0, 0)), AN_OK);
    EXPECT_TRUE(annotest::TableInvariantsHold(doc_));
}

}  // namespace
