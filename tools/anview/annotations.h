// The annotation file of anview: styles and annotations, read from JSON and checked
// before anything reaches the library. Positions are character offsets into the
// document's text (see the README); they are checked against the text and mapped to
// positions when the annotations are added (session.h).
#ifndef ANVIEW_ANNOTATIONS_H
#define ANVIEW_ANNOTATIONS_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace anview {

struct StyleSpec {
    uint32_t number = 0;  // 1-based place in the file, for messages
    uint32_t id = 0;
    bool global = false;
    std::optional<uint32_t> foreground;  // 0x00BBGGRR: the style's color1
    std::optional<uint32_t> background;  // 0x00BBGGRR: the style's color2
    bool bold = false;
    bool italic = false;
};

enum class AnnoKind { Highlight, Point, Range, Value, Text, Placeholder, CutMark };

struct AnnoSpec {
    uint32_t number = 0;  // 1-based place in the file; also the entry's userData
    AnnoKind kind = AnnoKind::Highlight;
    uint32_t tag = 0;  // as the file gives it (31 bits)
    std::string label;
    // Highlights and ranges: [start, end) in characters. Others: `at`, and with `index`
    // a unit of the annotation text already anchored at `at`.
    uint32_t start = 0;
    uint32_t end = 0;
    uint32_t at = 0;
    std::optional<uint32_t> index;
    uint32_t eventMask = 0;
    uint64_t value = 0;
    // Highlights: a style id, or palette indices for the colours.
    std::optional<uint32_t> style;
    std::optional<uint32_t> foregroundIndex;
    std::optional<uint32_t> backgroundIndex;
    std::string text;  // UTF-8
};

struct AnnotationSet {
    std::vector<StyleSpec> styles;
    std::vector<AnnoSpec> annotations;
};

// Reads an annotation file's contents; `source` names it in messages. Throws Failure
// with "<source>: ..." on invalid JSON or an invalid entry.
AnnotationSet parseAnnotations(std::string_view json, const std::string &source);

// The sixteen colours a highlight can name directly, as 0x00BBGGRR, and their names.
constexpr int kPaletteSize = 16;
extern const uint32_t kPalette[kPaletteSize];
extern const char *const kPaletteNames[kPaletteSize];

const char *kindName(AnnoKind kind);
// "#rrggbb" of a 0x00BBGGRR colour.
std::string colourText(uint32_t bgr);
// The palette name of a colour, or its "#rrggbb".
std::string colourName(uint32_t bgr);

}  // namespace anview

#endif  // ANVIEW_ANNOTATIONS_H
