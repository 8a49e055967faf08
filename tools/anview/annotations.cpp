#include "annotations.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <initializer_list>
#include <map>
#include <nlohmann/json.hpp>

#include "anno/anno.h"
#include "failure.h"

namespace anview {

const uint32_t kPalette[kPaletteSize] = {
    0x000000, 0x000080, 0x008000, 0x008080, 0x800000, 0x800080, 0x808000, 0xC0C0C0,
    0x808080, 0x0000FF, 0x00FF00, 0x00FFFF, 0xFF0000, 0xFF00FF, 0xFFFF00, 0xFFFFFF,
};
const char *const kPaletteNames[kPaletteSize] = {
    "black",     "dark red",   "dark green", "dark yellow", "dark blue", "dark magenta",
    "dark cyan", "light grey", "dark grey",  "red",         "green",     "yellow",
    "blue",      "magenta",    "cyan",       "white",
};

const char *kindName(AnnoKind kind) {
    switch (kind) {
        case AnnoKind::Highlight:
            return "highlight";
        case AnnoKind::Point:
            return "point";
        case AnnoKind::Range:
            return "range";
        case AnnoKind::Value:
            return "value";
        case AnnoKind::Text:
            return "text";
        case AnnoKind::Placeholder:
            return "placeholder";
        case AnnoKind::CutMark:
            return "cutmark";
    }
    return "?";
}

std::string colourText(uint32_t bgr) {
    char text[8];
    std::snprintf(text, sizeof text, "#%02x%02x%02x", bgr & 0xFF, (bgr >> 8) & 0xFF,
                  (bgr >> 16) & 0xFF);
    return text;
}

std::string colourName(uint32_t bgr) {
    for (int i = 0; i < kPaletteSize; ++i) {
        if (kPalette[i] == bgr) {
            return kPaletteNames[i];
        }
    }
    return colourText(bgr);
}

namespace {

using Json = nlohmann::json;

constexpr uint32_t kMaxTag = 0x7FFFFFFF;  // bit 31 is anview's own (see session.cpp)
constexpr uint32_t kMaxStyleId = 0xFFFF;  // a style word names a style in 16 bits
constexpr uint32_t kMaxOffset = 0xFFFFFFFF;

struct EventName {
    const char *name;
    uint32_t bit;
};
constexpr EventName kEventNames[] = {
    {"click1", ANEVENT_CLICK1}, {"click2", ANEVENT_CLICK2}, {"click3", ANEVENT_CLICK3},
    {"enter", ANEVENT_ENTER},   {"leave", ANEVENT_LEAVE},
};
constexpr uint32_t kAllEvents =
    ANEVENT_CLICK1 | ANEVENT_CLICK2 | ANEVENT_CLICK3 | ANEVENT_ENTER | ANEVENT_LEAVE;

struct KindName {
    const char *name;
    AnnoKind kind;
};
constexpr KindName kKindNames[] = {
    {"highlight", AnnoKind::Highlight}, {"point", AnnoKind::Point},
    {"range", AnnoKind::Range},         {"value", AnnoKind::Value},
    {"text", AnnoKind::Text},           {"placeholder", AnnoKind::Placeholder},
    {"cutmark", AnnoKind::CutMark},
};

// Reads the fields of one JSON object, with messages that name the object.
class Fields {
 public:
    Fields(const Json &object, std::string where) : object_(object), where_(std::move(where)) {
        if (!object_.is_object()) {
            fail("not a JSON object");
        }
    }

    [[noreturn]] void fail(const std::string &problem) const {
        throw Failure(where_ + ": " + problem);
    }

    // Every field must be one of `allowed`.
    void only(std::initializer_list<const char *> allowed) const {
        for (const auto &item : object_.items()) {
            if (std::none_of(allowed.begin(), allowed.end(),
                             [&](const char *name) { return item.key() == name; })) {
                fail("unknown field \"" + item.key() + "\"");
            }
        }
    }

    bool has(const char *name) const { return object_.contains(name); }

    const Json &need(const char *name) const {
        if (!has(name)) {
            fail(std::string("missing field \"") + name + "\"");
        }
        return object_.at(name);
    }

    uint64_t number(const char *name, uint64_t max) const {
        const Json &value = need(name);
        if (!value.is_number_unsigned() || value.get<uint64_t>() > max) {
            fail(std::string("\"") + name + "\" must be a whole number from 0 to " +
                 std::to_string(max));
        }
        return value.get<uint64_t>();
    }

    uint32_t number32(const char *name, uint32_t max) const {
        return static_cast<uint32_t>(number(name, max));
    }

    std::string string(const char *name) const {
        const Json &value = need(name);
        if (!value.is_string()) {
            fail(std::string("\"") + name + "\" must be a string");
        }
        return value.get<std::string>();
    }

    bool boolean(const char *name) const {
        const Json &value = need(name);
        if (!value.is_boolean()) {
            fail(std::string("\"") + name + "\" must be true or false");
        }
        return value.get<bool>();
    }

    const Json &array(const char *name) const {
        const Json &value = need(name);
        if (!value.is_array()) {
            fail(std::string("\"") + name + "\" must be an array");
        }
        return value;
    }

 private:
    const Json &object_;
    std::string where_;
};

std::optional<uint32_t> paletteIndex(std::string name) {
    std::transform(name.begin(), name.end(), name.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    for (int i = 0; i < kPaletteSize; ++i) {
        if (name == kPaletteNames[i]) {
            return static_cast<uint32_t>(i);
        }
    }
    return std::nullopt;
}

std::optional<uint32_t> hexColour(const std::string &text) {
    if (text.size() != 7 || text[0] != '#' ||
        text.find_first_not_of("0123456789abcdefABCDEF", 1) != std::string::npos) {
        return std::nullopt;
    }
    const uint32_t rgb = static_cast<uint32_t>(std::stoul(text.substr(1), nullptr, 16));
    return ((rgb & 0xFF) << 16) | (rgb & 0xFF00) | (rgb >> 16);
}

uint32_t styleColour(const Fields &fields, const char *name) {
    const std::string text = fields.string(name);
    if (const auto bgr = hexColour(text)) {
        return *bgr;
    }
    if (const auto index = paletteIndex(text)) {
        return kPalette[*index];
    }
    fields.fail(std::string("\"") + name + "\": \"" + text +
                "\" is neither #rrggbb nor a palette colour such as \"dark blue\"");
}

uint32_t directColour(const Fields &fields, const char *name) {
    const std::string text = fields.string(name);
    if (const auto index = paletteIndex(text)) {
        return *index;
    }
    fields.fail(std::string("\"") + name + "\": \"" + text +
                "\" is not one of the 16 palette colours (such as \"yellow\" or \"dark blue\"); "
                "other colours need a style");
}

uint32_t eventMask(const Fields &fields) {
    if (!fields.has("events")) {
        return kAllEvents;
    }
    uint32_t mask = 0;
    for (const Json &event : fields.array("events")) {
        const std::string name = event.is_string() ? event.get<std::string>() : std::string();
        const auto *found = std::find_if(std::begin(kEventNames), std::end(kEventNames),
                                         [&](const EventName &e) { return name == e.name; });
        if (found == std::end(kEventNames)) {
            fields.fail("\"events\": " + event.dump() +
                        " is not one of \"click1\", \"click2\", \"click3\", \"enter\", \"leave\"");
        }
        mask |= found->bit;
    }
    return mask;
}

StyleSpec readStyle(const Json &json, uint32_t number, const std::string &source) {
    const Fields fields(json, source + ": style " + std::to_string(number));
    fields.only({"id", "scope", "foreground", "background", "bold", "italic"});
    StyleSpec style;
    style.number = number;
    style.id = fields.number32("id", kMaxStyleId);
    if (fields.has("scope")) {
        const std::string scope = fields.string("scope");
        if (scope != "document" && scope != "global") {
            fields.fail("\"scope\" must be \"document\" or \"global\", not \"" + scope + "\"");
        }
        style.global = scope == "global";
    }
    if (fields.has("foreground")) {
        style.foreground = styleColour(fields, "foreground");
    }
    if (fields.has("background")) {
        style.background = styleColour(fields, "background");
    }
    style.bold = fields.has("bold") && fields.boolean("bold");
    style.italic = fields.has("italic") && fields.boolean("italic");
    return style;
}

AnnoSpec readAnnotation(const Json &json, uint32_t number, const std::string &source) {
    const Fields fields(json, source + ": annotation " + std::to_string(number));
    AnnoSpec anno;
    anno.number = number;
    const std::string type = fields.string("type");
    const auto *kind = std::find_if(std::begin(kKindNames), std::end(kKindNames),
                                    [&](const KindName &k) { return type == k.name; });
    if (kind == std::end(kKindNames)) {
        fields.fail("unknown type \"" + type + "\"");
    }
    anno.kind = kind->kind;
    anno.tag = fields.has("tag") ? fields.number32("tag", kMaxTag) : number;
    if (fields.has("label")) {
        anno.label = fields.string("label");
    }

    const bool spansText = anno.kind == AnnoKind::Highlight || anno.kind == AnnoKind::Range;
    if (spansText) {
        anno.start = fields.number32("start", kMaxOffset);
        anno.end = fields.number32("end", kMaxOffset);
        if (anno.end < anno.start) {
            fields.fail("\"end\" (" + std::to_string(anno.end) + ") comes before \"start\" (" +
                        std::to_string(anno.start) + ")");
        }
    } else {
        anno.at = fields.number32("at", kMaxOffset);
        if (fields.has("index")) {
            anno.index = fields.number32("index", kMaxOffset);
        }
    }

    switch (anno.kind) {
        case AnnoKind::Highlight:
            fields.only({"type", "tag", "label", "start", "end", "style", "foreground",
                         "background", "events", "value"});
            if (fields.has("style")) {
                if (fields.has("foreground") || fields.has("background")) {
                    fields.fail("give either \"style\" or \"foreground\"/\"background\", not both");
                }
                anno.style = fields.number32("style", kMaxStyleId);
            } else if (fields.has("foreground") || fields.has("background")) {
                if (fields.has("foreground")) {
                    anno.foregroundIndex = directColour(fields, "foreground");
                }
                if (fields.has("background")) {
                    anno.backgroundIndex = directColour(fields, "background");
                }
            } else {
                fields.fail("a highlight needs \"style\", or \"foreground\" or \"background\"");
            }
            anno.eventMask = eventMask(fields);
            anno.value = fields.has("value") ? fields.number("value", UINT64_MAX) : 0;
            break;
        case AnnoKind::Point:
        case AnnoKind::Value:
            fields.only({"type", "tag", "label", "at", "index", "value", "events"});
            anno.eventMask = eventMask(fields);
            anno.value = fields.has("value") ? fields.number("value", UINT64_MAX) : 0;
            break;
        case AnnoKind::Range:
            fields.only({"type", "tag", "label", "start", "end"});
            break;
        case AnnoKind::Text:
            fields.only({"type", "tag", "label", "at", "index", "text"});
            anno.text = fields.string("text");
            break;
        case AnnoKind::Placeholder:
        case AnnoKind::CutMark:
            fields.only({"type", "tag", "label", "at", "index"});
            break;
    }
    return anno;
}

// Drops nlohmann's "[json.exception.parse_error.101] " from a message.
std::string plainMessage(const std::string &what) {
    if (!what.empty() && what[0] == '[') {
        const auto close = what.find("] ");
        if (close != std::string::npos) {
            return what.substr(close + 2);
        }
    }
    return what;
}

}  // namespace

AnnotationSet parseAnnotations(std::string_view text, const std::string &source) {
    Json json;
    try {
        json = Json::parse(text.begin(), text.end());
    } catch (const Json::exception &e) {
        throw Failure(source + ": invalid JSON: " + plainMessage(e.what()));
    }
    const Fields top(json, source + ": the top level");
    top.only({"styles", "annotations"});

    AnnotationSet set;
    if (top.has("styles")) {
        uint32_t number = 0;
        for (const Json &style : top.array("styles")) {
            set.styles.push_back(readStyle(style, ++number, source));
        }
    }
    if (top.has("annotations")) {
        uint32_t number = 0;
        std::map<uint32_t, uint32_t> tags;  // tag -> the annotation that has it
        for (const Json &anno : top.array("annotations")) {
            AnnoSpec parsed = readAnnotation(anno, ++number, source);
            const auto [it, fresh] = tags.emplace(parsed.tag, parsed.number);
            if (!fresh) {
                const bool given = anno.contains("tag");
                throw Failure(source + ": annotation " + std::to_string(number) + ": tag " +
                              std::to_string(parsed.tag) +
                              (given ? "" : " (its number, the default)") +
                              " is already used by annotation " + std::to_string(it->second));
            }
            set.annotations.push_back(std::move(parsed));
        }
    }
    for (const AnnoSpec &anno : set.annotations) {
        if (anno.style && std::none_of(set.styles.begin(), set.styles.end(),
                                       [&](const StyleSpec &s) { return s.id == *anno.style; })) {
            throw Failure(source + ": annotation " + std::to_string(anno.number) + ": style " +
                          std::to_string(*anno.style) + " is not defined under \"styles\"");
        }
    }
    return set;
}

}  // namespace anview
