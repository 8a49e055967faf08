// One document bound to the annotation library: loading it, binding the global and
// per-document styles, adding the annotations of an annotation file, drawing it by a
// walk through its positions, the legend, and hover events. Everything goes through
// the public interface (anno/anno.h) and the toolkit stand-in (anno/toolkit.h).
#ifndef ANVIEW_SESSION_H
#define ANVIEW_SESSION_H

#include <cstdint>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <unordered_map>
#include <vector>

#include "anno/anno.h"
#include "annotations.h"
#include "page.h"

namespace anview {

// anview's style attributes (attr1 of a style, when the style has ANSTYLE_ATTR).
constexpr uint32_t kAttrBold = 0x1;
constexpr uint32_t kAttrItalic = 0x2;

class Session {
 public:
    // Loads a document from a UTF-8 file, or (`path` empty) from `text`; `name` names it in
    // messages. Makes the global style table and binds the document to the library.
    Session(const std::string &path, const std::string &text, const std::string &name);
    ~Session();
    Session(const Session &) = delete;
    Session &operator=(const Session &) = delete;

    // Characters (UTF-16 units) of the document's text items: the valid offsets are 0 to
    // length() - 1.
    uint32_t length() const { return length_; }

    // Registers the styles of `set` (global ones in the global table, the others with the
    // document), then adds its annotations in order. `source` names the file in messages.
    void add(const AnnotationSet &set, const std::string &source);

    // Walks the whole document and draws it into a page, with the legend of `set`.
    Page draw(const AnnotationSet &set, const std::string &title);

    // Sends a move event at each offset in turn and describes the enter and leave events
    // that reach the callback, one line each.
    std::vector<std::string> hover(const std::vector<uint32_t> &offsets, const AnnotationSet &set);

 private:
    struct Item {
        uint32_t id;
        uint32_t type;
        uint32_t firstChar;
        uint32_t charCount;
        std::u16string text;
    };
    struct Event {
        uint32_t event;
        uint32_t tag;
        uint64_t userData;
        bool wanted;
    };

    static uint32_t notify(uint16_t code, uint16_t detail, void *record, void *self);

    void addStyle(const StyleSpec &style, const std::string &source);
    void addAnnotation(const AnnoSpec &anno, const std::string &where);
    ANPos charPosition(uint32_t offset, const std::string &where);
    uint32_t ordinalOf(const ANPos &pos);
    uint32_t endOrdinalOf(const ANPos &pos);
    const Item *item(uint32_t id) const;
    bool isCutPosition(const ANPos &pos);
    void checkOffset(uint32_t offset, const std::string &what, const std::string &where) const;
    Look highlightLook(const AnnoSpec &anno);
    int keyFor(Look look, std::vector<ColourKey> &keys) const;
    std::vector<LegendLine> legend(const AnnotationSet &set, std::vector<ColourKey> &keys);
    std::string describe(uint64_t userData, const AnnotationSet &set) const;

    struct DocumentCloser {
        void operator()(DADocument *doc) const;
    };
    struct StyleTableCloser {
        void operator()(ANStyleTable *table) const;
    };
    // Ends the binding before the document and the global style table go (members are
    // destroyed in reverse order).
    struct Binding {
        DAHandle doc = nullptr;
        Binding() = default;
        Binding(const Binding &) = delete;
        Binding &operator=(const Binding &) = delete;
        ~Binding();
    };

    std::unique_ptr<DADocument, DocumentCloser> doc_;
    std::unique_ptr<ANStyleTable, StyleTableCloser> globalStyles_;
    Binding binding_;
    std::vector<Item> items_;
    std::unordered_map<uint32_t, std::size_t> itemIndex_;
    uint32_t length_ = 0;
    // Units of annotation text added so far at each offset, to check "index" fields.
    std::map<uint32_t, uint32_t> textUnits_;
    // Offsets where the annotation file anchors annotation text.
    std::set<uint32_t> textOffsets_;
    uint64_t insertedUnits_ = 0;
    std::vector<Event> events_;
};

}  // namespace anview

#endif  // ANVIEW_SESSION_H
