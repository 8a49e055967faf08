#include "oracles.h"

#include <cstring>
#include <string>

#include "anno/toolkit.h"
#include "support/track_model.h"

namespace annofuzz {

namespace {

bool Covers(const ANAnnoRecord &r, const ANPos &p) {
    return Cmp(r.start, p) <= 0 && Cmp(p, r.end) < 0;
}

// The style output a style word gives: palette colours for a direct word, the
// document's style and then the global one for a style number.
struct Style {
    uint32_t color1Set = 0, color2Set = 0, attrSet = 0;
    uint32_t color1 = 0, color2 = 0, attr1 = 0, attr2 = 0;
};

Style StyleFor(DAHandle doc, uint32_t word) {
    static constexpr uint32_t kPalette[16] = {
        0x000000, 0x000080, 0x008000, 0x008080, 0x800000, 0x800080, 0x808000, 0xC0C0C0,
        0x808080, 0x0000FF, 0x00FF00, 0x00FFFF, 0xFF0000, 0xFF00FF, 0xFFFF00, 0xFFFFFF};
    Style s;
    if ((word & ANSTYLEWORD_NUMBER) == 0) {
        s.color2Set = (word & ANSTYLEWORD_NOCOLOR2) == 0;
        s.color1Set = (word & ANSTYLEWORD_NOCOLOR1) == 0;
        s.color2 = kPalette[word & 0xF];
        s.color1 = kPalette[(word >> 4) & 0xF];
        return s;
    }
    ANHiliteStyle found{};
    if (CALL(ANGetHiliteStyle(doc, word & 0xFFFF, &found)) != 1) return s;
    s.color1Set = (found.flags & ANSTYLE_COLOR1) != 0;
    s.color2Set = (found.flags & ANSTYLE_COLOR2) != 0;
    s.attrSet = (found.flags & ANSTYLE_ATTR) != 0;
    s.color1 = found.color1;
    s.color2 = found.color2;
    s.attr1 = found.attr1;
    s.attr2 = found.attr2;
    return s;
}

std::string N(uint64_t v) { return std::to_string(v); }

}  // namespace

WalkCounts CheckTrackingWalk(DAHandle doc, const ANPos &start, const std::vector<ANPos> &positions,
                             uint32_t markLeft) {
    WalkCounts counts;
    const std::vector<Entry> list = ListEntries(doc);
    const SlotIndex at = ListIndex(list);
    const bool bound = antk::annoSlot(doc) != nullptr;

    ANTrackInfo track;
    std::memset(&track, 0x5A, sizeof track);
    track.markActive = markLeft;
    const ANTrackInfo untouched = track;
    const uint32_t started = CALL(ANStartAnnoTrack(doc, &start, &track));
    SetContext("tracking walk from " + Text(start));

    if (!bound || list.empty()) {
        CHECK(started == ANTRACK_NONE, "state " + N(started));
        if (!bound) CHECK(std::memcmp(&track, &untouched, sizeof track) == 0, "record written");
        for (const ANPos &p : positions) {
            const uint32_t bits = CALL(ANTrackAnno(doc, &p, &track));
            CHECK(bits == 0, "bits " + N(bits) + " at " + Text(p) + " without annotations");
            ++counts.positions;
        }
        return counts;
    }

    // The start: the first entry not wholly before it becomes the cursor.
    CHECK(track.rangeActive == 0 && track.markActive == markLeft, "start's range or mark flags");
    CHECK(track.color1Set + track.color2Set + track.attrSet == 0, "start's style flags");
    CHECK(track.hiliteEntry == AN_NONE, "hiliteEntry " + N(track.hiliteEntry));
    size_t first = list.size();
    for (size_t i = 0; i < list.size(); ++i) {
        if (Cmp(list[i].record.start, start) > 0 || Cmp(list[i].record.end, start) >= 0) {
            first = i;
            break;
        }
    }
    if (first == list.size()) {
        CHECK(started == ANTRACK_NOMORE, "state " + N(started) + ", everything ends before");
        CHECK(track.cursor == AN_NONE, "cursor " + N(track.cursor));
        CHECK(track.nextChange.itemId == 0xFFFFFFFFu && track.nextChange.subItemId == 0xFFFFFFFFu,
              "nextChange " + Text(track.nextChange));
    } else {
        CHECK(started == ANTRACK_ACTIVE, "state " + N(started));
        const Entry &e = list[first];
        CHECK(track.cursor == e.slot, "cursor " + N(track.cursor) + ", expected " + N(e.slot));
        const ANPos &expected = Cmp(e.record.start, start) < 0 ? start : e.record.start;
        CHECK(Cmp(track.nextChange, expected) == 0,
              "nextChange " + Text(track.nextChange) + ", expected " + Text(expected));
    }

    // What the last full call (or the start) left to be reported once more.
    bool previousRange = false;
    bool previousMark = markLeft != 0;
    bool previousHilite = false;
    std::vector<uint16_t> lastCover;  // nothing covers the span before the first change
    for (const ANPos &p : positions) {
        ++counts.positions;
        SetContext("tracking walk from " + Text(start) + ", at " + Text(p));
        std::vector<uint16_t> cover;
        for (const Entry &e : list) {
            if (Covers(e.record, p)) cover.push_back(e.slot);
        }
        const ANTrackInfo before = track;
        const bool full = Cmp(p, before.nextChange) >= 0;
        const uint32_t bits = CALL(ANTrackAnno(doc, &p, &track));
        if (!full) {
            CHECK(bits == 0, "bits " + N(bits) + " before nextChange " + Text(before.nextChange));
            CHECK(std::memcmp(&before, &track, sizeof track) == 0,
                  "record changed before nextChange");
            CHECK(cover == lastCover, "the covering entries changed before nextChange " +
                                          Text(before.nextChange) + " went unreported");
            continue;
        }
        ++counts.fullCalls;

        annotest::CoverReading<Entry> seed;
        seed.bits = (previousRange ? ANTRACK_BIT_RANGE : 0) |
                    (previousMark ? ANTRACK_BIT_CUTMARK : 0) |
                    (previousHilite ? ANTRACK_BIT_HILITE : 0);
        seed.userData = before.userData;
        if (previousRange && before.cursor != AN_NONE) {
            CHECK(at[before.cursor] >= 0, "cursor " + N(before.cursor) + " names no entry");
            seed.userData = list[at[before.cursor]].record.userData;
        }
        seed.value = before.value;
        seed.text = before.textBuffer;
        seed.textLength = before.textLength;
        const annotest::CoverReading<Entry> r = annotest::ReadCover(seed, cover, list, at);
        const uint32_t expectBits = r.bits;
        const uint64_t userData = r.userData;
        const uint64_t value = r.value;
        const uint16_t *text = r.text;
        const uint32_t textLength = r.textLength;
        const bool range = r.range;
        const bool mark = r.mark;
        const Entry *hilite = r.hilite;
        CHECK(bits == expectBits, "bits " + N(bits) + ", expected " + N(expectBits));
        CHECK(track.rangeActive == (range ? 1u : 0u), "rangeActive " + N(track.rangeActive));
        CHECK(track.markActive == (mark ? 1u : 0u), "markActive " + N(track.markActive));
        CHECK(track.value == value, "value " + N(track.value) + ", expected " + N(value));
        CHECK(track.textBuffer == text && track.textLength == textLength, "text of the last text");
        CHECK(track.userData == userData,
              "userData " + N(track.userData) + ", expected " + N(userData));
        const uint16_t hiliteSlot = hilite == nullptr ? AN_NONE : hilite->slot;
        CHECK(track.hiliteEntry == hiliteSlot,
              "hiliteEntry " + N(track.hiliteEntry) + ", expected " + N(hiliteSlot));
        if (hilite == nullptr) {
            CHECK(track.color1Set + track.color2Set + track.attrSet == 0, "style flags left set");
        } else {
            const Style s = StyleFor(doc, hilite->record.style);
            CHECK(track.color1Set == s.color1Set && track.color2Set == s.color2Set &&
                      track.attrSet == s.attrSet,
                  "style flags of word " + N(hilite->record.style));
            CHECK(!s.color1Set || track.color1 == s.color1, "color1");
            CHECK(!s.color2Set || track.color2 == s.color2, "color2");
            CHECK(!s.attrSet || (track.attr1 == s.attr1 && track.attr2 == s.attr2), "attributes");
        }

        // The cursor stays while its entry runs on past p; otherwise it moves on to
        // the next entry not wholly before p.
        size_t cursorAt = list.size();
        if (before.cursor != AN_NONE) {
            CHECK(at[before.cursor] >= 0, "cursor " + N(before.cursor) + " names no entry");
            cursorAt = static_cast<size_t>(at[before.cursor]);
        }
        if (cursorAt == list.size() || Cmp(list[cursorAt].record.end, p) <= 0) {
            size_t i = before.cursor == AN_NONE ? 0 : cursorAt + 1;
            while (i < list.size() && Cmp(list[i].record.start, p) <= 0 &&
                   Cmp(list[i].record.end, p) < 0) {
                ++i;
            }
            cursorAt = i;
        }
        const uint16_t cursorSlot = cursorAt == list.size() ? AN_NONE : list[cursorAt].slot;
        CHECK(track.cursor == cursorSlot,
              "cursor " + N(track.cursor) + ", expected " + N(cursorSlot));
        // nextChange: the nearest start or end after p, or p when the cursor ends there.
        const ANPos *nearest = nullptr;
        for (const Entry &e : list) {
            for (const ANPos *q : {&e.record.start, &e.record.end}) {
                if (Cmp(*q, p) > 0 && (nearest == nullptr || Cmp(*q, *nearest) < 0)) nearest = q;
            }
        }
        if (cursorAt == list.size()) {
            CHECK(nearest == nullptr, "no cursor though an annotation lies ahead");
            CHECK(track.nextChange.itemId == 0xFFFFFFFFu &&
                      track.nextChange.subItemId == 0xFFFFFFFFu &&
                      track.nextChange.kind == before.nextChange.kind &&
                      track.nextChange.textIndex == before.nextChange.textIndex,
                  "nextChange past the end " + Text(track.nextChange));
        } else {
            const ANAnnoRecord &k = list[cursorAt].record;
            if (Cmp(k.start, p) <= 0 && Cmp(k.end, p) == 0) {
                CHECK(Cmp(track.nextChange, p) == 0, "nextChange " + Text(track.nextChange));
            } else {
                CHECK(nearest != nullptr, "a cursor though nothing lies ahead");
                CHECK(Cmp(track.nextChange, *nearest) == 0,
                      "nextChange " + Text(track.nextChange) + ", expected " + Text(*nearest));
            }
        }
        previousRange = range;
        previousMark = mark;
        previousHilite = hilite != nullptr;
        lastCover = cover;
    }
    CHECK(CALL(ANEndAnnoTrack(doc, &track)) == 0, "ending a walk");
    return counts;
}

namespace {

// The text cache a track holds, as the table gave it at its last rebuild.
struct TextCache {
    std::vector<uint16_t> kinds;  // 5 or 6 per segment
    std::vector<std::u16string> texts;
};

// The segments a rebuild for `p`'s anchor gathers: from the first entry at that plain
// anchor, the text entries of the run of entries at it, in list order.
TextCache Gather(const std::vector<Entry> &list, const ANPos &p) {
    TextCache cache;
    size_t i = 0;
    while (i < list.size() && !SameAnchor(list[i].record.start, p)) ++i;
    for (; i < list.size() && SameAnchor(list[i].record.start, p); ++i) {
        if (list[i].type == AN_TYPE_TEXT) {
            cache.kinds.push_back(5);
            cache.texts.push_back(list[i].text);
        } else if (list[i].type == AN_TYPE_PLACEHOLDER) {
            cache.kinds.push_back(6);
            cache.texts.push_back(u"");
        }
    }
    return cache;
}

}  // namespace

void CheckTextReads(DAHandle doc, const std::vector<ANPos> &positions) {
    const std::vector<Entry> list = ListEntries(doc);
    const bool bound = antk::annoSlot(doc) != nullptr;
    ANAnnoTextTrack track;
    std::memset(&track, 0x77, sizeof track);
    const uint32_t started = CALL(ANStartAnnoTextTrack(doc, &track));
    CHECK(started == 0, "starting a text track: " + N(started));
    const ANPos zero{0, 0, 0, 0};
    CHECK(track.segs != nullptr && Same(track.firstPos, zero) && Same(track.lastPos, zero),
          "a started text track");
    TextCache cache;
    for (const ANPos &p : positions) {
        SetContext("annotation text at " + Text(p));
        const ANAnnoTextTrack before = track;
        uint16_t unit = 0xABCD;
        const uint32_t rc = CALL(ANGetAnnoText(doc, &track, &p, &unit));
        // The cache answers only for its own plain anchor: text at (i, 0xFFFFFFFF) and
        // at (i, 0) sorts as one but is not the same text.
        const bool cached = SameAnchor(p, before.firstPos) && Cmp(p, before.firstPos) >= 0 &&
                            Cmp(p, before.lastPos) <= 0;
        if (!cached) {
            if (!bound) {
                CHECK(rc == AN_ERR_NOSTATE, "result " + N(rc) + " without annotation state");
                CHECK(unit == 0xABCD, "unit written");
                continue;
            }
            cache = Gather(list, p);
            uint32_t total = 0;
            for (size_t s = 0; s < cache.kinds.size(); ++s) {
                total += cache.kinds[s] == 6 ? 1 : static_cast<uint32_t>(cache.texts[s].size());
            }
            if (cache.kinds.empty()) {
                CHECK(Same(track.firstPos, zero) && Same(track.lastPos, zero),
                      "cached range " + Text(track.firstPos) + " to " + Text(track.lastPos) +
                          " with nothing cached");
            } else {
                const ANPos firstPos{p.itemId, p.subItemId, ANPOS_ANNOTEXT, 0};
                const ANPos lastPos{p.itemId, p.subItemId, ANPOS_ANNOTEXT, total - 1};
                CHECK(Same(track.firstPos, firstPos) && Same(track.lastPos, lastPos),
                      "cached range " + Text(track.firstPos) + " to " + Text(track.lastPos));
            }
        } else {
            CHECK(Same(track.firstPos, before.firstPos) && Same(track.lastPos, before.lastPos),
                  "the cached range moved on a cached read");
        }
        // The lookup in the (new) cache.
        uint32_t expected = AN_ERR_NOTFOUND;
        uint16_t expectedUnit = 0xABCD;
        if (SameAnchor(p, track.firstPos) && Cmp(p, track.firstPos) >= 0 &&
            Cmp(p, track.lastPos) <= 0) {
            uint64_t sum = 0;
            for (size_t s = 0; s < cache.kinds.size(); ++s) {
                const uint64_t length = cache.kinds[s] == 6 ? 1 : cache.texts[s].size();
                if (sum + length > p.textIndex) {
                    if (cache.kinds[s] == 6) {
                        expected = 6;
                        expectedUnit = 0;
                    } else {
                        expected = 5;
                        expectedUnit = cache.texts[s][p.textIndex - sum];
                    }
                    break;
                }
                sum += length;
            }
        }
        CHECK(rc == expected, "result " + N(rc) + ", expected " + N(expected));
        CHECK(unit == expectedUnit, "unit " + N(unit) + ", expected " + N(expectedUnit));
    }
    CHECK(CALL(ANEndAnnoTextTrack(doc, &track)) == 0, "ending a text track");
    CHECK(track.segs == nullptr && Same(track.firstPos, zero) && Same(track.lastPos, zero),
          "an ended text track is all zero");
}

void CheckEvent(const std::vector<Entry> &list, uint32_t event, uint16_t entry, const ANPos &pos,
                uint16_t hoverEntry, const ANPos &hoverPos, bool callback,
                const std::vector<Note> &notes, uint32_t result) {
    struct Delivery {
        uint32_t code;
        const Entry *entry;
    };
    std::vector<Delivery> expected;
    const SlotIndex at = ListIndex(list);
    const bool live = entry == AN_NONE || at[entry] >= 0;
    // Entries from `from` on, up to the first starting after `p`, that contain `p`
    // (and, for crossings, not `other`).
    auto walk = [&](uint16_t from, const ANPos &p, const ANPos *other, uint32_t code) {
        for (size_t i = static_cast<size_t>(at[from]); i < list.size(); ++i) {
            const ANAnnoRecord &r = list[i].record;
            if (Cmp(p, r.start) < 0) break;
            if (Covers(r, p) && (other == nullptr || !Covers(r, *other))) {
                expected.push_back({code, &list[i]});
            }
        }
    };
    const bool click =
        event == ANEVENT_CLICK1 || event == ANEVENT_CLICK2 || event == ANEVENT_CLICK3;
    if (!list.empty() && live && click && entry != AN_NONE) walk(entry, pos, nullptr, event);
    if (!list.empty() && live && event == ANEVENT_MOVE) {
        if (hoverEntry != AN_NONE) {
            CHECK(at[hoverEntry] >= 0, "hover entry " + N(hoverEntry) + " is no entry");
            walk(hoverEntry, hoverPos, &pos, ANEVENT_LEAVE);
        }
        if (entry != AN_NONE) walk(entry, pos, &hoverPos, ANEVENT_ENTER);
    }
    if (!callback) {
        CHECK(notes.empty() && result == 0, "delivered without a callback");
        return;
    }
    CHECK(notes.size() == expected.size(),
          N(notes.size()) + " deliveries, expected " + N(expected.size()));
    for (size_t i = 0; i < notes.size(); ++i) {
        const Note &n = notes[i];
        const Delivery &d = expected[i];
        const uint16_t wanted = (d.entry->record.eventMask & d.code) != 0 ? 1 : 0;
        CHECK(n.code == ANNOTIFY_EVENT && n.detail == wanted && n.event.size == ANEVENTREC_SIZE &&
                  n.event.event == d.code && n.event.tag == d.entry->record.tag &&
                  n.event.userData == d.entry->record.userData,
              "delivery " + N(i) + " (event " + N(n.event.event) + ") should go to slot " +
                  N(d.entry->slot) + " with event " + N(d.code));
    }
    const uint32_t last = notes.empty() ? 0 : notes.back().returned;
    CHECK(result == last, "result " + N(result) + ", the last callback said " + N(last));
}

namespace {

bool TagPasses(uint16_t mode, uint32_t tag, uint32_t entryTag) {
    if ((mode & ANFIND_MASK) != 0) return (entryTag & tag) == tag;
    if ((mode & ANFIND_EQUAL) != 0) return entryTag == tag;
    return false;
}

bool Lenient(uint32_t tag) { return tag == 0 || (tag & 0x80000000u) != 0; }

}  // namespace

uint32_t ExpectedFind(DAHandle doc, uint16_t flags, const ANFindRecord &find, ANFindRecord *out,
                      bool *startKnown) {
    const std::vector<Entry> list = ListEntries(doc);
    *startKnown = true;
    if (find.size != ANFINDRECORD_SIZE) return AN_ERR_BADARG;
    if (list.empty()) return AN_ERR_NOTFOUND;
    const uint32_t kind = find.mode & ANFIND_KINDMASK;
    const uint32_t tag = find.tag;
    const ANPos &key = find.key;
    auto passes = [&](const Entry &e) { return TagPasses(find.mode, tag, e.record.tag); };
    const Entry *found = nullptr;
    const long n = static_cast<long>(list.size());
    switch (kind) {
        case ANFIND_FIRST:
            for (long i = 0; i < n && found == nullptr; ++i) {
                if (passes(list[i])) found = &list[i];
            }
            break;
        case ANFIND_LAST:
            for (long i = n - 1; i >= 0 && found == nullptr; --i) {
                if (passes(list[i])) found = &list[i];
            }
            break;
        case ANFIND_BEFORE: {
            long i = n - 1;
            for (; i >= 0; --i) {
                const ANPos &end = list[i].record.end;
                if (Cmp(end, key) > 0) continue;
                const bool rejected = Lenient(tag)
                                          ? end.kind == key.itemId && end.textIndex == key.subItemId
                                          : end.kind != 0xFFFFFFFFu && end.subItemId == 0xFFFFFFFFu;
                if (!rejected) break;
            }
            for (; i >= 0 && found == nullptr; --i) {
                if (passes(list[i])) found = &list[i];
            }
            break;
        }
        case ANFIND_AFTER: {
            long i = 0;
            for (; i < n; ++i) {
                const ANAnnoRecord &r = list[i].record;
                if (Cmp(r.start, key) <= 0) continue;
                if ((flags & ANFIND_AFTER_PREVIOUS) != 0 && Cmp(r.start, find.foundEnd) <= 0)
                    continue;
                if (!Lenient(tag) && r.end.subItemId == 0xFFFFFFFFu) continue;
                break;
            }
            for (; i < n && found == nullptr; ++i) {
                if (passes(list[i])) found = &list[i];
            }
            break;
        }
        case ANFIND_FROM: {
            long i = 0;
            while (i < n && Cmp(list[i].record.start, key) < 0) ++i;
            for (; i < n && found == nullptr; ++i) {
                if (passes(list[i])) found = &list[i];
            }
            break;
        }
        case ANFIND_AT:
            for (long i = 0; i < n && found == nullptr; ++i) {
                const ANAnnoRecord &r = list[i].record;
                if (Cmp(r.start, key) > 0) break;
                if (Covers(r, key) && passes(list[i])) found = &list[i];
            }
            break;
        default:
            return AN_ERR_NOTFOUND;
    }
    if (found == nullptr) return AN_ERR_NOTFOUND;
    *out = find;
    const ANAnnoRecord &r = found->record;
    out->foundTag = r.tag;
    out->foundUserData = r.userData;
    if (found->type == AN_TYPE_TEXT || found->type == AN_TYPE_PLACEHOLDER) {
        const uint32_t units = found->type == AN_TYPE_TEXT ? r.textLength : 1;
        out->foundEnd = r.start;
        if (r.start.kind == ANPOS_ANNOTEXT) {
            out->foundStart = r.start;
            out->foundStart.textIndex = r.start.textIndex - units;
        } else {
            // The units at the anchor, as stepping counts them.
            ANPos p{r.start.itemId, r.start.subItemId, ANPOS_ANNOTEXT, 0};
            uint32_t steps = 0;
            for (;;) {
                ANPos next{};
                ++steps;
                if (CALL(ANNextPos(doc, &p, &next)) != 0 || steps > 100000) {
                    *startKnown = false;
                    break;
                }
                if (next.kind != ANPOS_ANNOTEXT) break;
                p = next;
            }
            out->foundStart =
                ANPos{r.start.itemId, r.start.subItemId, ANPOS_ANNOTEXT, steps - units};
        }
    } else {
        out->foundStart = r.start;
        out->foundEnd = r.end;
    }
    return 0;
}

}  // namespace annofuzz
