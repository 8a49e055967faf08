#include "session.h"

#include <algorithm>

#include "anno/toolkit.h"
#include "failure.h"
#include "utf.h"

namespace anview {

namespace {

// Tags of anview's annotations carry bit 31: they are the viewer's own, so a clear that
// selects nothing leaves them alone, and searches by tag look at every entry (finding
// passes over entries that end on an item only for tags without it).
constexpr uint32_t kOwnTag = ANTAG_PROTECTED;
constexpr uint32_t kUnmapped = 0xFFFFFFFFu;
constexpr uint32_t kCutItemType = 0;
// What ANGetAnnoText finds at a position of annotation text.
constexpr uint32_t kReadUnit = 5;
constexpr uint32_t kReadPlaceholder = 6;
constexpr uint32_t kReplacement = 0xFFFD;
constexpr uint32_t kControlPictures = 0x2400;  // U+2400 + c shows control character c
// More positions than a walk can have: items, characters and annotation text, twice.
constexpr uint64_t kWalkSlack = 64;
constexpr std::size_t kMaxEntriesPerAnnotation = 1u << 20;

bool isTextKind(AnnoKind kind) { return kind == AnnoKind::Text || kind == AnnoKind::Placeholder; }

std::string offsetRange(uint32_t from, uint32_t to) {
    return std::to_string(from) + "-" + std::to_string(to);
}

std::string coloursText(const Look &look) {
    std::string text;
    if (look.hasForeground && look.hasBackground) {
        text = colourName(look.foreground) + " on " + colourName(look.background);
    } else if (look.hasForeground) {
        text = colourName(look.foreground) + " text";
    } else if (look.hasBackground) {
        text = "on " + colourName(look.background);
    } else {
        text = "no colours";
    }
    if (look.bold) {
        text += ", bold";
    }
    if (look.italic) {
        text += ", italic";
    }
    return text;
}

// Reads annotation text through a text track that lives as long as the walk.
class TextTrack {
 public:
    explicit TextTrack(DAHandle doc) : doc_(doc) {
        const uint32_t result = ANStartAnnoTextTrack(doc_, &track_);
        if (result != AN_OK) {
            throw Failure("cannot start reading annotation text: " + describeResult(result));
        }
    }
    ~TextTrack() { ANEndAnnoTextTrack(doc_, &track_); }
    TextTrack(const TextTrack &) = delete;
    TextTrack &operator=(const TextTrack &) = delete;

    uint32_t read(const ANPos &pos, uint16_t &unit) {
        return ANGetAnnoText(doc_, &track_, &pos, &unit);
    }

 private:
    DAHandle doc_;
    ANAnnoTextTrack track_{};
};

// Turns the walk's characters and marks into the blocks of a page: a block per paragraph
// and per cut item, annotation text between brackets, surrogate pairs joined.
class Drawer {
 public:
    explicit Drawer(Page &page) : page_(page) {}

    void paragraph() {
        flushPending();
        closeText();
        page_.blocks.push_back(Block{});
    }

    void cutBlock() {
        flushPending();
        closeText();
        page_.blocks.push_back(Block{true, {}});
    }

    void cutLine(const Look &look) { put(kCutLine, look); }

    // Content follows: the annotation text before it ends.
    void leaveText() {
        if (inText_) {
            flushPending();
            closeText();
        }
    }

    void mark(const char *text, Look look) {
        flushPending();
        look.mark = true;
        put(text, look);
    }

    void content(uint32_t unit, const Look &look) {
        closeText();
        character(unit, look);
    }

    // Before the first unit of each anchor's annotation text, an opening bracket.
    void enterText(uint64_t anchor, const Look &look) {
        if (inText_ && anchor == anchor_) {
            return;
        }
        flushPending();
        closeText();
        Look open = look;
        open.inserted = true;
        put(kOpenText, open);
        inText_ = true;
        anchor_ = anchor;
        textLook_ = open;
    }

    void inserted(uint32_t unit, Look look) {
        look.inserted = true;
        textLook_ = look;
        character(unit, look);
    }

    void placeholder(Look look) {
        look.inserted = true;
        textLook_ = look;
        mark(kMarkPlaceholder, look);
    }

    void finish() {
        flushPending();
        closeText();
    }

 private:
    void character(uint32_t unit, const Look &look) {
        if (pendingHigh_ != 0) {
            if (isLowSurrogate(unit)) {
                std::string text;
                appendUtf8(text, combineSurrogates(pendingHigh_, unit));
                pendingHigh_ = 0;
                put(text, pendingLook_);
                return;
            }
            flushPending();
        }
        if (isHighSurrogate(unit)) {
            pendingHigh_ = unit;
            pendingLook_ = look;
            return;
        }
        std::string text;
        if (unit == '\n') {
            text = "\n";
        } else if (unit == '\t') {
            text = " ";
        } else if (unit < 0x20) {
            appendUtf8(text, kControlPictures + unit);
        } else {
            appendUtf8(text, isLowSurrogate(unit) ? kReplacement : unit);
        }
        put(text, look);
    }

    void flushPending() {
        if (pendingHigh_ != 0) {
            pendingHigh_ = 0;
            std::string text;
            appendUtf8(text, kReplacement);
            put(text, pendingLook_);
        }
    }

    void closeText() {
        if (!inText_) {
            return;
        }
        flushPending();
        inText_ = false;
        Look close = textLook_;
        close.mark = false;
        put(kCloseText, close);
    }

    void put(std::string text, const Look &look) {
        if (page_.blocks.empty()) {
            page_.blocks.push_back(Block{});
        }
        page_.blocks.back().cells.push_back(Cell{std::move(text), look});
    }

    Page &page_;
    bool inText_ = false;
    uint64_t anchor_ = 0;
    Look textLook_;
    uint32_t pendingHigh_ = 0;
    Look pendingLook_;
};

}  // namespace

void Session::DocumentCloser::operator()(DADocument *doc) const { antk::destroyDocument(doc); }

void Session::StyleTableCloser::operator()(ANStyleTable *table) const {
    ANDeInitGlobalHiliteStyles(table);
}

Session::Binding::~Binding() {
    if (doc != nullptr) {
        ANDeInit(doc);
    }
}

Session::Session(const std::string &path, const std::string &text, const std::string &name) {
    std::string error;
    DAHandle doc = path.empty() ? antk::loadText(text, &error) : antk::loadTextFile(path, &error);
    if (doc == nullptr) {
        // The file loader names the file itself.
        throw Failure(path.empty() ? name + ": " + error : error);
    }
    doc_.reset(doc);

    for (const antk::ItemView &view : antk::items(doc)) {
        Item item{view.id, view.type, view.firstChar, view.charCount, {}};
        if (view.type == antk::kItemText) {
            item.text = antk::itemText(doc, view.id);
            length_ += static_cast<uint32_t>(item.text.size());
        }
        itemIndex_.emplace(view.id, items_.size());
        items_.push_back(std::move(item));
    }

    ANStyleTable *table = nullptr;
    uint32_t result = ANInitGlobalHiliteStyles(&table);
    if (result != AN_OK) {
        throw Failure("cannot make the global style table: " + describeResult(result));
    }
    globalStyles_.reset(table);

    result = ANInit(doc, table, &Session::notify, this);
    if (result != AN_OK) {
        throw Failure(name +
                      ": cannot bind the document to the library: " + describeResult(result));
    }
    binding_.doc = doc;
}

Session::~Session() = default;

uint32_t Session::notify(uint16_t code, uint16_t detail, void *record, void *self) {
    if (code == ANNOTIFY_EVENT && record != nullptr) {
        const auto *event = static_cast<const ANEventRec *>(record);
        static_cast<Session *>(self)->events_.push_back(
            Event{event->event, event->tag, event->userData, detail != 0});
    }
    return 0;
}

const Session::Item *Session::item(uint32_t id) const {
    const auto found = itemIndex_.find(id);
    return found == itemIndex_.end() ? nullptr : &items_[found->second];
}

// ---- Adding ---------------------------------------------------------------------------

void Session::add(const AnnotationSet &set, const std::string &source) {
    for (const AnnoSpec &anno : set.annotations) {
        if (anno.kind == AnnoKind::Text || anno.kind == AnnoKind::Placeholder) {
            textOffsets_.insert(anno.at);
        }
    }
    for (const StyleSpec &style : set.styles) {
        addStyle(style, source);
    }
    for (const AnnoSpec &anno : set.annotations) {
        addAnnotation(anno, source + ": annotation " + std::to_string(anno.number));
        if (anno.kind == AnnoKind::Text) {
            insertedUnits_ += toUtf16(anno.text).size();
        } else if (anno.kind == AnnoKind::Placeholder) {
            ++insertedUnits_;
        }
    }
}

void Session::addStyle(const StyleSpec &parsed, const std::string &source) {
    ANHiliteStyle style{};
    style.size = ANHILITESTYLE_SIZE;
    style.styleId = parsed.id;
    if (parsed.foreground) {
        style.flags |= ANSTYLE_COLOR1;
        style.color1 = *parsed.foreground;
    }
    if (parsed.background) {
        style.flags |= ANSTYLE_COLOR2;
        style.color2 = *parsed.background;
    }
    if (parsed.bold || parsed.italic) {
        style.flags |= ANSTYLE_ATTR;
        style.attr1 =
            static_cast<uint16_t>((parsed.bold ? kAttrBold : 0) | (parsed.italic ? kAttrItalic : 0));
    }
    const uint32_t result = parsed.global ? ANAddGlobalHiliteStyle(globalStyles_.get(), &style)
                                        : ANAddHiliteStyle(doc_.get(), &style);
    if (result != AN_OK) {
        throw Failure(source + ": style " + std::to_string(parsed.number) +
                      ": the library did not add it: " + describeResult(result));
    }
}

void Session::checkOffset(uint32_t offset, const std::string &what,
                          const std::string &where) const {
    if (offset < length_) {
        return;
    }
    if (length_ == 0) {
        throw Failure(where + ": " + what + " " + std::to_string(offset) +
                      " is beyond the text, which is empty");
    }
    throw Failure(where + ": " + what + " " + std::to_string(offset) +
                  " is beyond the text (characters 0 to " + std::to_string(length_ - 1) + ")");
}

ANPos Session::charPosition(uint32_t offset, const std::string &where) {
    ANMapRecord map{};
    map.size = ANMAPRECORD_SIZE;
    map.flags = ANMAP_ORDINAL_TO_POS;
    map.ordinal = offset;
    map.pos.itemId = kUnmapped;
    map.pos.subItemId = kUnmapped;
    const uint32_t result = ANMapPosition(doc_.get(), &map);
    if (result != AN_OK) {
        throw Failure(where + ": offset " + std::to_string(offset) +
                      " cannot be mapped to a position: " + describeResult(result));
    }
    const Item *holder = item(map.pos.itemId);
    if (holder == nullptr || holder->type != antk::kItemText ||
        map.pos.subItemId - holder->firstChar >= holder->charCount) {
        throw Failure(where + ": offset " + std::to_string(offset) +
                      " was mapped to a position that is not a character");
    }
    return ANPos{map.pos.itemId, map.pos.subItemId, 0, 0};
}

void Session::addAnnotation(const AnnoSpec &anno, const std::string &where) {
    const uint32_t tag = anno.tag | kOwnTag;
    uint32_t result = AN_OK;

    if (anno.kind == AnnoKind::Highlight || anno.kind == AnnoKind::Range) {
        checkOffset(anno.start, "\"start\"", where);
        if (anno.end > length_) {
            throw Failure(where + ": \"end\" " + std::to_string(anno.end) +
                          " is beyond the end of the text (" + std::to_string(length_) +
                          " characters)");
        }
        const ANPos start = charPosition(anno.start, where);
        ANPos end = start;
        if (anno.end > anno.start) {
            // Just after the last character covered. Where the file anchors annotation text
            // at the next character, before that text, so that it stays outside whatever
            // the order of adding; elsewhere at the next character itself, so that ranges
            // that meet are joined.
            const ANPos last = charPosition(anno.end - 1, where);
            const bool textAtEnd = textOffsets_.count(anno.end) != 0;
            end = ANPos{last.itemId, last.subItemId + 1, textAtEnd ? ANPOS_ANNOTEXT : 0, 0};
        }
        if (anno.kind == AnnoKind::Highlight) {
            ANAnnoRecord record{};
            record.size = AN_RECORD_SIZE_POINT;
            record.tag = tag;
            record.start = start;
            record.end = end;
            record.eventMask = anno.eventMask;
            record.userData = anno.number;
            record.value = anno.value;
            if (anno.style) {
                record.style = ANSTYLEWORD_NUMBER | *anno.style;
            } else {
                record.style =
                    (anno.foregroundIndex.value_or(0) << 4) | anno.backgroundIndex.value_or(0);
                if (!anno.foregroundIndex) {
                    record.style |= ANSTYLEWORD_NOCOLOR1;
                }
                if (!anno.backgroundIndex) {
                    record.style |= ANSTYLEWORD_NOCOLOR2;
                }
            }
            result = ANAddAnno(doc_.get(), AN_TYPE_HILITE, &record);
        } else {
            ANRangeDesc range{};
            range.size = sizeof range;
            range.tag = tag;
            range.start = start;
            range.end = end;
            range.userData = anno.number;
            result = ANAddAnno(doc_.get(), AN_TYPE_RANGE, &range);
        }
    } else {
        checkOffset(anno.at, "offset", where);
        ANPos pos = charPosition(anno.at, where);
        uint32_t &units = textUnits_[anno.at];
        if (anno.index) {
            if (*anno.index >= units) {
                throw Failure(where + ": \"index\" " + std::to_string(*anno.index) +
                              " is beyond the annotation text at offset " +
                              std::to_string(anno.at) + " (" + std::to_string(units) + " units)");
            }
            pos.kind = ANPOS_ANNOTEXT;
            pos.textIndex = *anno.index;
        }
        switch (anno.kind) {
            case AnnoKind::Point:
            case AnnoKind::Value: {
                ANAnnoRecord record{};
                record.size = AN_RECORD_SIZE_POINT;
                record.tag = tag;
                record.start = pos;
                record.end = pos;
                record.eventMask = anno.eventMask;
                record.userData = anno.number;
                record.value = anno.value;
                result = ANAddAnno(doc_.get(),
                                   anno.kind == AnnoKind::Point ? AN_TYPE_POINT : AN_TYPE_VALUE,
                                   &record);
                break;
            }
            case AnnoKind::Text: {
                const std::u16string text = toUtf16(anno.text);
                ANTextDesc desc{};
                desc.size = sizeof desc;
                desc.tag = tag;
                desc.pos = pos;
                desc.userData = anno.number;
                desc.text = reinterpret_cast<const uint16_t *>(text.data());
                desc.textLength = static_cast<uint32_t>(text.size());
                result = ANAddAnno(doc_.get(), AN_TYPE_TEXT, &desc);
                if (result == AN_OK) {
                    units += desc.textLength;
                }
                break;
            }
            case AnnoKind::Placeholder:
            case AnnoKind::CutMark: {
                ANPointDesc desc{};
                desc.size = sizeof desc;
                desc.tag = tag;
                desc.pos = pos;
                desc.userData = anno.number;
                const bool placeholder = anno.kind == AnnoKind::Placeholder;
                result = ANAddAnno(doc_.get(), placeholder ? AN_TYPE_PLACEHOLDER : AN_TYPE_CUTMARK,
                                   &desc);
                if (result == AN_OK && placeholder) {
                    ++units;
                }
                break;
            }
            case AnnoKind::Highlight:
            case AnnoKind::Range:
                break;
        }
    }
    if (result != AN_OK) {
        throw Failure(where + ": the library did not add it: " + describeResult(result));
    }
}

// ---- Drawing --------------------------------------------------------------------------

int Session::keyFor(Look look, std::vector<ColourKey> &keys) const {
    if (!look.highlighted) {
        return -1;
    }
    // Only what the highlight decides tells keys apart.
    look.underline = false;
    look.inserted = false;
    look.mark = false;
    look.key = -1;
    for (std::size_t i = 0; i < keys.size(); ++i) {
        if (keys[i].look.sameStyle(look)) {
            return static_cast<int>(i);
        }
    }
    const int index = static_cast<int>(keys.size());
    keys.push_back(ColourKey{look, keyLetter(index)});
    return index;
}

Page Session::draw(const AnnotationSet &set, const std::string &title) {
    Page page;
    page.title = title;
    if (!items_.empty()) {
        DAHandle doc = doc_.get();
        const Item &first = items_.front();
        ANPos pos{first.id, first.type == antk::kItemText ? first.firstChar : ANPOS_NOSUBITEM, 0,
                  0};
        TextTrack text(doc);
        uint16_t unit = 0;
        // Annotation text anchored at the first position comes before it.
        const ANPos firstText{pos.itemId, pos.subItemId, ANPOS_ANNOTEXT, 0};
        const uint32_t firstRead = text.read(firstText, unit);
        if (firstRead == kReadUnit || firstRead == kReadPlaceholder) {
            pos = firstText;
        }

        ANTrackInfo track{};
        track.cursor = AN_NONE;
        track.hiliteEntry = AN_NONE;
        ANStartAnnoTrack(doc, &pos, &track);

        Drawer drawer(page);
        const uint64_t bound =
            2 * (items_.size() + uint64_t{length_} + insertedUnits_) + kWalkSlack;
        for (uint64_t steps = 0;; ++steps) {
            if (steps > bound) {
                throw Failure("the walk through the document does not end");
            }
            const uint32_t bits = ANTrackAnno(doc, &pos, &track);
            Look look;
            look.highlighted = track.hiliteEntry != AN_NONE;
            if (look.highlighted) {
                look.hasForeground = track.color1Set != 0;
                look.foreground = look.hasForeground ? track.color1 : 0;
                look.hasBackground = track.color2Set != 0;
                look.background = look.hasBackground ? track.color2 : 0;
                if (track.attrSet != 0) {
                    look.bold = (track.attr1 & kAttrBold) != 0;
                    look.italic = (track.attr1 & kAttrItalic) != 0;
                }
            }
            look.underline = track.rangeActive != 0;
            look.key = keyFor(look, page.keys);

            const bool inText = pos.kind == ANPOS_ANNOTEXT;
            const Item *holder = inText ? nullptr : item(pos.itemId);
            look.inserted = inText;
            // The block or bracket a position opens comes before the marks reported there.
            if (inText) {
                drawer.enterText((uint64_t{pos.itemId} << 32) | pos.subItemId, look);
            } else {
                drawer.leaveText();
                if (holder != nullptr && holder->type == antk::kItemParagraph) {
                    drawer.paragraph();
                } else if (holder != nullptr && holder->type == kCutItemType) {
                    drawer.cutBlock();
                }
            }
            // Marks are reported where their annotation starts, as the change there.
            if ((bits & ANTRACK_BIT_CUTMARK) != 0 && track.markActive != 0) {
                drawer.mark(kMarkCut, look);
            }
            if ((bits & ANTRACK_BIT_POINT) != 0) {
                drawer.mark(kMarkPoint, look);
            }
            if ((bits & ANTRACK_BIT_VALUE) != 0) {
                drawer.mark(kMarkValue, look);
            }

            if (inText) {
                const uint32_t read = text.read(pos, unit);
                if (read == kReadUnit) {
                    drawer.inserted(unit, look);
                } else if (read == kReadPlaceholder) {
                    drawer.placeholder(look);
                } else if (read != AN_ERR_NOTFOUND) {
                    throw Failure("cannot read annotation text: " + describeResult(read));
                }
            } else if (holder != nullptr && holder->type == antk::kItemText) {
                const uint32_t index =
                    pos.subItemId == ANPOS_NOSUBITEM ? 0 : pos.subItemId - holder->firstChar;
                if (index < holder->text.size()) {
                    drawer.content(holder->text[index], look);
                }
            } else if (holder != nullptr && holder->type == kCutItemType) {
                drawer.cutLine(look);
            }

            ANPos next{};
            if (ANNextPos(doc, &pos, &next) != AN_OK) {
                break;
            }
            pos = next;
        }
        drawer.finish();
        ANEndAnnoTrack(doc, &track);
    }
    page.legend = legend(set, page.keys);
    return page;
}

// ---- Legend ---------------------------------------------------------------------------

uint32_t Session::ordinalOf(const ANPos &pos) {
    ANMapRecord map{};
    map.size = ANMAPRECORD_SIZE;
    map.flags = ANMAP_POS_TO_ORDINAL;
    map.pos = ANPos{pos.itemId, pos.subItemId, 0, 0};
    map.ordinal = kUnmapped;
    const uint32_t result = ANMapPosition(doc_.get(), &map);
    if (result != AN_OK || map.ordinal == kUnmapped) {
        throw Failure("legend: a position cannot be mapped to an offset: " +
                      describeResult(result));
    }
    return map.ordinal;
}

// The offset an annotation's end stands for: the character after the last one covered.
uint32_t Session::endOrdinalOf(const ANPos &pos) {
    const Item *holder = item(pos.itemId);
    if (holder != nullptr && holder->type == antk::kItemText && pos.subItemId != ANPOS_NOSUBITEM &&
        pos.subItemId > holder->firstChar) {
        return ordinalOf(ANPos{pos.itemId, pos.subItemId - 1, 0, 0}) + 1;
    }
    return ordinalOf(pos);
}

bool Session::isCutPosition(const ANPos &pos) {
    if (pos.kind == ANPOS_ANNOTEXT) {
        TextTrack text(doc_.get());
        uint16_t unit = 0;
        return text.read(pos, unit) == kReadPlaceholder;
    }
    const Item *holder = item(pos.itemId);
    return holder != nullptr && holder->type == kCutItemType;
}

Look Session::highlightLook(const AnnoSpec &anno) {
    Look look;
    look.highlighted = true;
    if (anno.style) {
        ANHiliteStyle style{};
        if (ANGetHiliteStyle(doc_.get(), *anno.style, &style) != 0) {
            look.hasForeground = (style.flags & ANSTYLE_COLOR1) != 0;
            look.foreground = look.hasForeground ? style.color1 : 0;
            look.hasBackground = (style.flags & ANSTYLE_COLOR2) != 0;
            look.background = look.hasBackground ? style.color2 : 0;
            if ((style.flags & ANSTYLE_ATTR) != 0) {
                look.bold = (style.attr1 & kAttrBold) != 0;
                look.italic = (style.attr1 & kAttrItalic) != 0;
            }
        }
    } else {
        look.hasForeground = anno.foregroundIndex.has_value();
        look.foreground = look.hasForeground ? kPalette[*anno.foregroundIndex] : 0;
        look.hasBackground = anno.backgroundIndex.has_value();
        look.background = look.hasBackground ? kPalette[*anno.backgroundIndex] : 0;
    }
    return look;
}

std::vector<LegendLine> Session::legend(const AnnotationSet &set, std::vector<ColourKey> &keys) {
    struct Found {
        ANPos start;
        ANPos end;
    };
    std::vector<LegendLine> lines;
    for (const AnnoSpec &anno : set.annotations) {
        // Every entry that carries this annotation's tag, in document order: the first,
        // then each one that starts after the one before.
        std::vector<Found> found;
        ANFindRecord find{};
        find.size = ANFINDRECORD_SIZE;
        find.mode = ANFIND_FIRST | ANFIND_EQUAL;
        find.tag = anno.tag | kOwnTag;
        uint32_t result = ANFindAnno(doc_.get(), 0, &find);
        while (result == AN_OK && found.size() < kMaxEntriesPerAnnotation) {
            found.push_back(Found{find.foundStart, find.foundEnd});
            // A text entry is reported from its first unit to where it stands in the list.
            const ANPos listed = isTextKind(anno.kind) ? find.foundEnd : find.foundStart;
            find.mode = ANFIND_AFTER | ANFIND_EQUAL;
            find.key = listed;
            find.foundEnd = listed;
            result = ANFindAnno(doc_.get(), ANFIND_AFTER_PREVIOUS, &find);
        }
        if (result != AN_OK && result != AN_ERR_NOTFOUND) {
            throw Failure("legend: annotation " + std::to_string(anno.number) +
                          ": finding it failed: " + describeResult(result));
        }

        LegendLine line;
        line.number = anno.number;
        line.kind = kindName(anno.kind);
        line.label = anno.label;
        auto at = [&](const ANPos &pos) {
            std::string text = "at " + std::to_string(ordinalOf(pos));
            // An empty text has no unit of its own to give an index to.
            const bool empty = anno.kind == AnnoKind::Text && anno.text.empty();
            if (pos.kind == ANPOS_ANNOTEXT && pos.textIndex != 0 && !empty) {
                text += ", index " + std::to_string(pos.textIndex);
            }
            return text;
        };

        if (anno.kind == AnnoKind::Range) {
            line.where = offsetRange(anno.start, anno.end);
            std::vector<std::string> pieces;
            std::vector<std::string> marks;
            for (const Found &entry : found) {
                if (isCutPosition(entry.start)) {
                    marks.push_back(std::to_string(ordinalOf(entry.start)));
                } else {
                    pieces.push_back(offsetRange(ordinalOf(entry.start), endOrdinalOf(entry.end)));
                }
            }
            auto join = [](const std::vector<std::string> &parts) {
                std::string text;
                for (const std::string &part : parts) {
                    text += (text.empty() ? "" : ", ") + part;
                }
                return text;
            };
            if (found.empty()) {
                line.detail = "no entry of its own (merged into another range)";
            } else {
                line.detail = (pieces.size() == 1 ? "piece " : "pieces ") + join(pieces);
                if (pieces.empty()) {
                    line.detail = "no piece";
                }
                if (!marks.empty()) {
                    line.detail += (marks.size() == 1 ? "; cut marker at " : "; cut markers at ") +
                                   join(marks);
                }
            }
        } else if (found.empty()) {
            line.where = anno.kind == AnnoKind::Highlight ? offsetRange(anno.start, anno.end)
                                                          : "at " + std::to_string(anno.at);
            line.detail = anno.kind == AnnoKind::Text
                              ? "appended to the annotation text already there"
                              : "no entry found";
        } else {
            const Found &entry = found.front();
            switch (anno.kind) {
                case AnnoKind::Highlight: {
                    line.where = offsetRange(ordinalOf(entry.start), endOrdinalOf(entry.end));
                    const Look look = highlightLook(anno);
                    line.key = keyFor(look, keys);
                    if (anno.style) {
                        const bool own = std::any_of(
                            set.styles.begin(), set.styles.end(),
                            [&](const StyleSpec &s) { return s.id == *anno.style && !s.global; });
                        line.detail = "style " + std::to_string(*anno.style) +
                                      (own ? " (document): " : " (global): ");
                    }
                    line.detail += coloursText(look);
                    break;
                }
                case AnnoKind::Point:
                case AnnoKind::Value:
                    line.where = at(entry.start);
                    line.detail = "value " + std::to_string(anno.value);
                    break;
                case AnnoKind::Text:
                    line.where = at(entry.start);
                    line.detail = std::string(kOpenText) + anno.text + kCloseText;
                    break;
                case AnnoKind::Placeholder:
                case AnnoKind::CutMark:
                case AnnoKind::Range:
                    line.where = at(entry.start);
                    break;
            }
            if (found.size() > 1) {
                line.detail += (line.detail.empty() ? "" : "; ") + std::string("stored as ") +
                               std::to_string(found.size()) + " entries";
            }
        }
        lines.push_back(std::move(line));
    }
    return lines;
}

// ---- Hover ----------------------------------------------------------------------------

std::string Session::describe(uint64_t userData, const AnnotationSet &set) const {
    for (const AnnoSpec &anno : set.annotations) {
        if (anno.number == userData) {
            std::string text = "[" + std::to_string(anno.number) + "] " + kindName(anno.kind);
            if (!anno.label.empty()) {
                text += " \"" + anno.label + "\"";
            }
            return text;
        }
    }
    return "[?] an entry the library made";
}

std::vector<std::string> Session::hover(const std::vector<uint32_t> &offsets,
                                        const AnnotationSet &set) {
    for (const uint32_t offset : offsets) {
        checkOffset(offset, "offset", "--hover");
    }
    std::vector<std::string> lines;
    for (const uint32_t offset : offsets) {
        const ANPos pos = charPosition(offset, "--hover");
        // The walk from the first entry that is not wholly before the position.
        ANTrackInfo track{};
        track.cursor = AN_NONE;
        track.hiliteEntry = AN_NONE;
        const uint32_t state = ANStartAnnoTrack(doc_.get(), &pos, &track);
        const uint16_t entry = state == ANTRACK_NONE ? AN_NONE : track.cursor;
        ANEndAnnoTrack(doc_.get(), &track);

        events_.clear();
        ANAnnoEvent(doc_.get(), ANEVENT_MOVE, entry, &pos);
        const std::string prefix = "hover " + std::to_string(offset) + ": ";
        if (events_.empty()) {
            lines.push_back(prefix + "nothing entered or left");
        }
        for (const Event &event : events_) {
            std::string name = event.event == ANEVENT_ENTER ? "enter"
                               : event.event == ANEVENT_LEAVE
                                   ? "leave"
                                   : "event " + std::to_string(event.event);
            lines.push_back(prefix + name + " " + describe(event.userData, set) + " (tag " +
                            std::to_string(event.tag & ~kOwnTag) +
                            (event.wanted ? ")" : ", not wanted)"));
        }
    }
    events_.clear();
    return lines;
}

}  // namespace anview
