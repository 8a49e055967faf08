// What a walk through a document produces and the renderers draw: blocks of cells, each
// cell one character or mark with the look it has there, a key of the highlight colours,
// the legend and the hover events.
#ifndef ANVIEW_PAGE_H
#define ANVIEW_PAGE_H

#include <cstdint>
#include <string>
#include <vector>

namespace anview {

// How one cell is drawn.
struct Look {
    bool highlighted = false;  // a highlight is in force (even one without colours)
    bool hasForeground = false;
    bool hasBackground = false;
    uint32_t foreground = 0;  // 0x00BBGGRR
    uint32_t background = 0;
    bool bold = false;
    bool italic = false;
    bool underline = false;  // inside a range annotation
    bool inserted = false;   // annotation text, or the brackets around it
    bool mark = false;       // a point, value, cut or placeholder mark
    int key = -1;            // index of the colour key of a highlighted cell

    bool sameStyle(const Look &o) const {
        return highlighted == o.highlighted && hasForeground == o.hasForeground &&
               hasBackground == o.hasBackground && (!hasForeground || foreground == o.foreground) &&
               (!hasBackground || background == o.background) && bold == o.bold &&
               italic == o.italic && underline == o.underline && inserted == o.inserted &&
               mark == o.mark;
    }
};

struct Cell {
    std::string text;  // UTF-8 of one character or mark; "\n" is a line break
    Look look;
};

struct Block {
    bool cut = false;  // a cut item of the document rather than a paragraph
    std::vector<Cell> cells;
};

// A distinct highlight appearance, in the order the drawing first meets it.
struct ColourKey {
    Look look;
    char letter;
};

struct LegendLine {
    uint32_t number = 0;
    std::string kind;    // "highlight", "range", ...
    std::string where;   // "12-20", "at 12", ...
    std::string detail;  // colours, value, text, pieces
    int key = -1;        // colour key of a highlight
    std::string label;
};

struct Page {
    std::string title;
    std::vector<Block> blocks;
    std::vector<ColourKey> keys;
    std::vector<LegendLine> legend;
    std::vector<std::string> hover;
    bool hoverAsked = false;
};

// The letter of key `index`: a to z, then '*'.
inline char keyLetter(int index) { return index < 26 ? static_cast<char>('a' + index) : '*'; }

// Marks drawn in the text.
constexpr const char *kMarkPoint = "\u2022";        // bullet
constexpr const char *kMarkValue = "\u25e6";        // white bullet
constexpr const char *kMarkCut = "\u00a6";          // broken bar
constexpr const char *kMarkPlaceholder = "\u25a1";  // white square
constexpr const char *kOpenText = "\u27e8";         // mathematical left angle bracket
constexpr const char *kCloseText = "\u27e9";
constexpr const char *kCutLine = "---";

}  // namespace anview

#endif  // ANVIEW_PAGE_H
