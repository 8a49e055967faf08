#include "fuzz_support.h"

#include <algorithm>
#include <cstring>
#include <string>
#include <utility>

#include "anno/toolkit.h"
#include "support/track_model.h"

namespace annofuzz {

namespace {

constexpr ANPos kEnd{0xFFFFFFFFu, 0xFFFFFFFFu, 0, 0};  // nextChange's anchor past the end

bool Covers(const ANAnnoRecord &r, const ANPos &p) {
    return Cmp(r.start, p) <= 0 && Cmp(p, r.end) < 0;
}

// The style output a style word gives: palette colours for a direct word, the
// document's style and then the global one for a style number.
struct Style {
    uint32_t color1Set = 0, color2Set = 0, attrSet = 0, color1 = 0, color2 = 0, attr1 = 0,
             attr2 = 0;
};

Style StyleFor(DAHandle doc, uint32_t word) {
    static constexpr uint32_t kPalette[16] = {
        0x000000, 0x000080, 0x008000, 0x008080, 0x800000, 0x800080, 0x808000, 0xC0C0C0,
        0x808080, 0x0000FF, 0x00FF00, 0x00FFFF, 0xFF0000, 0xFF00FF, 0xFFFF00, 0xFFFFFF};
    if ((word & ANSTYLEWORD_NUMBER) == 0)
        return {(word & ANSTYLEWORD_NOCOLOR1) == 0, (word & ANSTYLEWORD_NOCOLOR2) == 0, 0,
                kPalette[(word >> 4) & 0xF], kPalette[word & 0xF]};
    ANHiliteStyle f{};
    if (CALL(ANGetHiliteStyle(doc, word & 0xFFFF, &f)) != 1) return {};
    const auto h = [&](uint32_t b) { return (f.flags & b) != 0 ? 1u : 0u; };
    return Style{h(ANSTYLE_COLOR1), h(ANSTYLE_COLOR2), h(ANSTYLE_ATTR), f.color1,
                 f.color2,          f.attr1,           f.attr2};
}

}  // namespace

void CheckTrackingWalk(DAHandle doc, const ANPos &start, const std::vector<ANPos> &positions,
                       uint32_t markLeft) {
    const std::vector<Entry> list = ListEntries(doc);
    const SlotIndex at(list);
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
        }
        return;
    }
    // The start: the first entry not wholly before it becomes the cursor.
    CHECK(track.rangeActive == 0 && track.markActive == markLeft && track.hiliteEntry == AN_NONE &&
              track.color1Set + track.color2Set + track.attrSet == 0,
          "start's flags, hiliteEntry " + N(track.hiliteEntry));
    const auto first = std::find_if(list.begin(), list.end(), [&](const Entry &e) {
        return Cmp(e.record.start, start) > 0 || Cmp(e.record.end, start) >= 0;
    });
    if (first == list.end()) {
        CHECK(started == ANTRACK_NOMORE && track.cursor == AN_NONE &&
                  SameAnchor(track.nextChange, kEnd),
              "state " + N(started) + " cursor " + N(track.cursor) + ", everything ends before");
    } else {
        const ANPos &expected = Cmp(first->record.start, start) < 0 ? start : first->record.start;
        CHECK(started == ANTRACK_ACTIVE && track.cursor == first->slot &&
                  Cmp(track.nextChange, expected) == 0,
              "state " + N(started) + " cursor " + N(track.cursor) + " nextChange " +
                  Text(track.nextChange));
    }
    // The range, mark and highlight bits the last full call (or the start) leaves to be
    // reported once more, and what covered its position (nothing, before the first change).
    uint32_t carried = markLeft != 0 ? ANTRACK_BIT_CUTMARK : 0;
    std::vector<uint16_t> lastCover;
    for (const ANPos &p : positions) {
        SetContext("tracking walk from " + Text(start) + ", at " + Text(p));
        std::vector<uint16_t> cover;
        for (const Entry &e : list)
            if (Covers(e.record, p)) cover.push_back(e.slot);
        const ANTrackInfo before = track;
        const bool full = Cmp(p, before.nextChange) >= 0;
        const uint32_t bits = CALL(ANTrackAnno(doc, &p, &track));
        if (!full) {
            CHECK(
                bits == 0 && std::memcmp(&before, &track, sizeof track) == 0 && cover == lastCover,
                "bits " + N(bits) + ", record or cover changed before nextChange");
            continue;
        }
        size_t cursorAt = list.size();
        if (before.cursor != AN_NONE) {
            CHECK(at[before.cursor] >= 0, "cursor " + N(before.cursor) + " names no entry");
            cursorAt = static_cast<size_t>(at[before.cursor]);
        }
        const bool rangeOn = (carried & ANTRACK_BIT_RANGE) != 0 && cursorAt < list.size();
        const uint64_t userData = rangeOn ? list[cursorAt].record.userData : before.userData;
        const annotest::CoverReading<Entry> r =
            annotest::ReadCover(annotest::CoverReading<Entry>{carried, userData, before.value,
                                                              before.textBuffer, before.textLength},
                                cover, list, at);
        const uint16_t hiliteSlot = r.hilite == nullptr ? AN_NONE : r.hilite->slot;
        CHECK(bits == r.bits && track.rangeActive == (r.range ? 1u : 0u) &&
                  track.markActive == (r.mark ? 1u : 0u) && track.value == r.value &&
                  track.textBuffer == r.text && track.textLength == r.textLength &&
                  track.userData == r.userData && track.hiliteEntry == hiliteSlot,
              "bits " + N(bits) + ", expected " + N(r.bits) + "; or a field of the record");
        const Style s = r.hilite == nullptr ? Style{} : StyleFor(doc, r.hilite->record.style);
        CHECK(track.color1Set == s.color1Set && track.color2Set == s.color2Set &&
                  track.attrSet == s.attrSet && (!s.color1Set || track.color1 == s.color1) &&
                  (!s.color2Set || track.color2 == s.color2) &&
                  (!s.attrSet || (track.attr1 == s.attr1 && track.attr2 == s.attr2)),
              "style flags or colours of the highlight in force");
        // The cursor stays while its entry runs on past p; otherwise it moves on to
        // the next entry not wholly before p.
        if (cursorAt == list.size() || Cmp(list[cursorAt].record.end, p) <= 0) {
            size_t i = before.cursor == AN_NONE ? 0 : cursorAt + 1;
            while (i < list.size() && Cmp(list[i].record.start, p) <= 0 &&
                   Cmp(list[i].record.end, p) < 0)
                ++i;
            cursorAt = i;
        }
        const uint16_t cursorSlot = cursorAt == list.size() ? AN_NONE : list[cursorAt].slot;
        CHECK(track.cursor == cursorSlot, "cursor " + N(track.cursor) + ", not " + N(cursorSlot));
        // nextChange: the nearest start or end after p, or p when the cursor ends there.
        const ANPos *nearest = nullptr;
        for (const Entry &e : list)
            for (const ANPos *q : {&e.record.start, &e.record.end})
                if (Cmp(*q, p) > 0 && (nearest == nullptr || Cmp(*q, *nearest) < 0)) nearest = q;
        const ANPos pastEnd{kEnd.itemId, kEnd.subItemId, before.nextChange.kind,
                            before.nextChange.textIndex};
        const bool endsAtP = cursorAt < list.size() && Cmp(list[cursorAt].record.start, p) <= 0 &&
                             Cmp(list[cursorAt].record.end, p) == 0;
        CHECK(cursorAt == list.size() ? nearest == nullptr && Same(track.nextChange, pastEnd)
              : endsAtP               ? Cmp(track.nextChange, p) == 0
                                      : nearest != nullptr && Cmp(track.nextChange, *nearest) == 0,
              "nextChange " + Text(track.nextChange) + " with cursor " + N(cursorSlot));
        carried = (r.range ? ANTRACK_BIT_RANGE : 0) | (r.mark ? ANTRACK_BIT_CUTMARK : 0) |
                  (r.hilite != nullptr ? ANTRACK_BIT_HILITE : 0);
        lastCover = cover;
    }
    CHECK(CALL(ANEndAnnoTrack(doc, &track)) == 0, "ending a walk");
}

void CheckTextReads(DAHandle doc, const std::vector<ANPos> &positions, bool faulty) {
    const std::vector<Entry> list = ListEntries(doc);
    const bool bound = antk::annoSlot(doc) != nullptr;
    ANAnnoTextTrack track;
    std::memset(&track, 0x77, sizeof track);
    const uint32_t started = CALL(ANStartAnnoTextTrack(doc, &track));
    if (faulty && started != 0) return;
    CHECK(started == 0, "starting a text track: " + N(started));
    const ANPos zero{0, 0, 0, 0};
    auto range = [&](const ANPos &from, const ANPos &to) {
        return Same(track.firstPos, from) && Same(track.lastPos, to);
    };
    // The cache answers only for its own plain anchor: text at (i, 0xFFFFFFFF) and
    // at (i, 0) sorts as one but is not the same text.
    auto inCache = [](const ANPos &p, const ANAnnoTextTrack &t) {
        return SameAnchor(p, t.firstPos) && Cmp(p, t.firstPos) >= 0 && Cmp(p, t.lastPos) <= 0;
    };
    CHECK(track.segs != nullptr && range(zero, zero), "a started text track");
    // The cache as the table gave it at its last rebuild: per segment its kind (5 or 6)
    // and text; a rebuild for p gathers the text entries of the run of entries at p's
    // plain anchor, in list order.
    std::vector<std::pair<uint32_t, std::u16string>> cache;
    auto units = [](const auto &seg) -> uint32_t { return seg.first == 6 ? 1 : seg.second.size(); };
    for (const ANPos &p : positions) {
        SetContext("annotation text at " + Text(p));
        const ANAnnoTextTrack before = track;
        uint16_t unit = 0xABCD;
        const uint32_t rc = CALL(ANGetAnnoText(doc, &track, &p, &unit));
        if (faulty && rc != 5 && rc != 6 && rc != AN_ERR_NOTFOUND) break;  // a failure's code
        if (inCache(p, before)) {
            CHECK(range(before.firstPos, before.lastPos),
                  "the cached range moved on a cached read");
        } else if (!bound) {
            CHECK(rc == AN_ERR_NOSTATE && unit == 0xABCD, "result " + N(rc) + " without state");
            continue;
        } else {
            cache.clear();
            auto e = std::find_if(list.begin(), list.end(),
                                  [&](const Entry &x) { return SameAnchor(x.record.start, p); });
            for (; e != list.end() && SameAnchor(e->record.start, p); ++e) {
                if (e->type == AN_TYPE_TEXT) cache.push_back({5, e->text});
                if (e->type == AN_TYPE_PLACEHOLDER) cache.push_back({6, u""});
            }
            uint32_t total = 0;
            for (const auto &seg : cache) total += units(seg);
            CHECK(cache.empty() ? range(zero, zero)
                                : range({p.itemId, p.subItemId, ANPOS_ANNOTEXT, 0},
                                        {p.itemId, p.subItemId, ANPOS_ANNOTEXT, total - 1}),
                  "cached range " + Text(track.firstPos) + " to " + Text(track.lastPos));
        }
        uint32_t expected = AN_ERR_NOTFOUND;
        uint16_t expectedUnit = 0xABCD;
        uint64_t sum = 0;  // the units of the segments before
        for (const auto &seg : cache) {
            if (!inCache(p, track)) break;
            if (sum + units(seg) > p.textIndex) {
                expected = seg.first;
                expectedUnit = expected == 6 ? 0 : seg.second[p.textIndex - sum];
                break;
            }
            sum += units(seg);
        }
        CHECK(rc == expected && unit == expectedUnit,
              "result " + N(rc) + " unit " + N(unit) + ", expected " + N(expected));
    }
    CHECK(CALL(ANEndAnnoTextTrack(doc, &track)) == 0, "ending a text track");
    CHECK(track.segs == nullptr && range(zero, zero), "an ended text track is all zero");
}

void CheckEvent(const std::vector<Entry> &list, uint32_t event, uint16_t entry, const ANPos &pos,
                uint16_t hoverEntry, const ANPos &hoverPos, bool callback,
                const std::vector<Note> &notes, uint32_t result) {
    std::vector<std::pair<uint32_t, const Entry *>> expected;  // event code and entry
    const SlotIndex at(list);
    const bool live = !list.empty() && (entry == AN_NONE || at[entry] >= 0);
    // Entries from `from` on, up to the first starting after `p`, that contain `p`
    // (and, for crossings, not `other`).
    auto walk = [&](uint16_t from, const ANPos &p, const ANPos *other, uint32_t code) {
        for (size_t i = static_cast<size_t>(at[from]); i < list.size(); ++i) {
            const ANAnnoRecord &r = list[i].record;
            if (Cmp(p, r.start) < 0) break;
            if (Covers(r, p) && (other == nullptr || !Covers(r, *other)))
                expected.push_back({code, &list[i]});
        }
    };
    const bool click =
        event == ANEVENT_CLICK1 || event == ANEVENT_CLICK2 || event == ANEVENT_CLICK3;
    if (live && click && entry != AN_NONE) walk(entry, pos, nullptr, event);
    if (live && event == ANEVENT_MOVE) {
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
          N(notes.size()) + " deliveries of " + N(expected.size()));
    for (size_t i = 0; i < notes.size(); ++i) {
        const Note &n = notes[i];
        const auto [code, e] = expected[i];
        const uint16_t wanted = (e->record.eventMask & code) != 0 ? 1 : 0;
        CHECK(n.code == ANNOTIFY_EVENT && n.detail == wanted && n.event.size == ANEVENTREC_SIZE &&
                  n.event.event == code && n.event.tag == e->record.tag &&
                  n.event.userData == e->record.userData,
              "delivery " + N(i) + " (event " + N(n.event.event) + ") should go to slot " +
                  N(e->slot) + " with event " + N(code));
    }
    const uint32_t last = notes.empty() ? 0 : notes.back().returned;
    CHECK(result == last, "result " + N(result) + ", the last callback said " + N(last));
}

uint32_t ExpectedFind(DAHandle doc, uint16_t flags, const ANFindRecord &find, ANFindRecord *out,
                      bool *startKnown) {
    const std::vector<Entry> list = ListEntries(doc);
    *startKnown = true;
    if (find.size != ANFINDRECORD_SIZE) return AN_ERR_BADARG;
    if (list.empty()) return AN_ERR_NOTFOUND;
    const uint32_t kind = find.mode & ANFIND_KINDMASK;
    const ANPos &key = find.key;
    const bool lenient = find.tag == 0 || (find.tag & 0x80000000u) != 0;
    const long n = static_cast<long>(list.size());
    auto rec = [&](long i) -> const ANAnnoRecord & { return list[i].record; };
    // Where the scan starts and which way it goes; the first entry met from there that
    // passes the tag test (and for ANFIND_AT covers the key) is the one found.
    long i = 0, step = 1;
    switch (kind) {
        case ANFIND_FIRST:
        case ANFIND_AT:
            break;
        case ANFIND_LAST:
            i = n - 1, step = -1;
            break;
        case ANFIND_BEFORE:
            for (i = n - 1, step = -1; i >= 0; --i) {
                const ANPos &end = rec(i).end;
                const bool rejected = lenient
                                          ? end.kind == key.itemId && end.textIndex == key.subItemId
                                          : end.kind != 0xFFFFFFFFu && end.subItemId == 0xFFFFFFFFu;
                if (Cmp(end, key) <= 0 && !rejected) break;
            }
            break;
        case ANFIND_AFTER:
            while (i < n && (Cmp(rec(i).start, key) <= 0 ||
                             ((flags & ANFIND_AFTER_PREVIOUS) != 0 &&
                              Cmp(rec(i).start, find.foundEnd) <= 0) ||
                             (!lenient && rec(i).end.subItemId == 0xFFFFFFFFu))) {
                ++i;
            }
            break;
        case ANFIND_FROM:
            while (i < n && Cmp(rec(i).start, key) < 0) ++i;
            break;
        default:
            return AN_ERR_NOTFOUND;
    }
    const Entry *found = nullptr;
    for (; i >= 0 && i < n && found == nullptr; i += step) {
        if (kind == ANFIND_AT && Cmp(rec(i).start, key) > 0) break;
        const uint32_t tag = rec(i).tag;
        const bool passes = (find.mode & ANFIND_MASK) != 0    ? (tag & find.tag) == find.tag
                            : (find.mode & ANFIND_EQUAL) != 0 ? tag == find.tag
                                                              : false;
        if (passes && (kind != ANFIND_AT || Covers(rec(i), key))) found = &list[i];
    }
    if (found == nullptr) return AN_ERR_NOTFOUND;
    *out = find;
    const ANAnnoRecord &r = found->record;
    out->foundTag = r.tag, out->foundUserData = r.userData, out->foundStart = r.start;
    const bool text = found->type == AN_TYPE_TEXT || found->type == AN_TYPE_PLACEHOLDER;
    out->foundEnd = text ? r.start : r.end;
    if (!text) return 0;
    const uint32_t units = found->type == AN_TYPE_TEXT ? r.textLength : 1;
    if (r.start.kind == ANPOS_ANNOTEXT) {
        out->foundStart.textIndex = r.start.textIndex - units;
        return 0;
    }
    // The units at the anchor, as stepping counts them.
    ANPos p{r.start.itemId, r.start.subItemId, ANPOS_ANNOTEXT, 0};
    uint32_t steps = 0;
    for (ANPos next{};; p = next) {
        next = {};
        if (CALL(ANNextPos(doc, &p, &next)) != 0 || ++steps > 100000) {
            *startKnown = false;
            break;
        }
        if (next.kind != ANPOS_ANNOTEXT) break;
    }
    out->foundStart = ANPos{r.start.itemId, r.start.subItemId, ANPOS_ANNOTEXT, steps - units};
    return 0;
}

}  // namespace annofuzz
