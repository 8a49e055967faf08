#include "render.h"

#include <algorithm>
#include <string>
#include <vector>

namespace anview {

namespace {

// ---- Columns --------------------------------------------------------------------------

// Decodes the code point at `i` of valid UTF-8 and moves `i` past it.
uint32_t nextCodePoint(const std::string &text, std::size_t &i) {
    const auto b0 = static_cast<unsigned char>(text[i++]);
    if (b0 < 0x80) {
        return b0;
    }
    const int extra = b0 >= 0xF0 ? 3 : b0 >= 0xE0 ? 2 : 1;
    uint32_t cp = b0 & (0x3Fu >> extra);
    for (int k = 0; k < extra && i < text.size(); ++k) {
        cp = (cp << 6) | (static_cast<unsigned char>(text[i++]) & 0x3Fu);
    }
    return cp;
}

// Terminal columns of a code point: 0 for combining marks, 2 for wide East Asian
// characters and most emoji, 1 otherwise.
int columnsOf(uint32_t cp) {
    struct Range {
        uint32_t first;
        uint32_t last;
    };
    static constexpr Range kZero[] = {{0x0300, 0x036F}, {0x1AB0, 0x1AFF}, {0x1DC0, 0x1DFF},
                                      {0x200B, 0x200F}, {0x20D0, 0x20FF}, {0xFE00, 0xFE0F},
                                      {0xFE20, 0xFE2F}};
    static constexpr Range kWide[] = {{0x1100, 0x115F},   {0x2E80, 0x303E},  {0x3041, 0x33FF},
                                      {0x3400, 0x4DBF},   {0x4E00, 0x9FFF},  {0xA000, 0xA4CF},
                                      {0xAC00, 0xD7A3},   {0xF900, 0xFAFF},  {0xFE30, 0xFE4F},
                                      {0xFF00, 0xFF60},   {0xFFE0, 0xFFE6},  {0x1F300, 0x1F64F},
                                      {0x1F900, 0x1F9FF}, {0x20000, 0x3FFFD}};
    auto in = [cp](const auto &ranges) {
        return std::any_of(std::begin(ranges), std::end(ranges),
                           [cp](const Range &r) { return cp >= r.first && cp <= r.last; });
    };
    return in(kZero) ? 0 : in(kWide) ? 2 : 1;
}

int columnsOf(const std::string &text) {
    int columns = 0;
    for (std::size_t i = 0; i < text.size();) {
        columns += columnsOf(nextCodePoint(text, i));
    }
    return columns;
}

// ---- Layout ---------------------------------------------------------------------------

using Row = std::vector<const Cell *>;

// Splits a block into lines at its line breaks and wraps each line at `width` columns,
// after the last space that fits (the space itself is dropped), or within a word that
// is longer than a line.
std::vector<Row> layOut(const Block &block, uint32_t width) {
    std::vector<Row> rows;
    std::vector<const Cell *> line;
    auto wrap = [&]() {
        std::size_t begin = 0;
        while (true) {
            std::size_t end = begin;
            int columns = 0;
            while (end < line.size() &&
                   columns + columnsOf(line[end]->text) <= static_cast<int>(width)) {
                columns += columnsOf(line[end]->text);
                ++end;
            }
            if (end == line.size()) {
                rows.emplace_back(line.begin() + static_cast<std::ptrdiff_t>(begin), line.end());
                break;
            }
            std::size_t cut = end;
            while (cut > begin && line[cut]->text != " ") {
                --cut;
            }
            if (cut > begin) {
                rows.emplace_back(line.begin() + static_cast<std::ptrdiff_t>(begin),
                                  line.begin() + static_cast<std::ptrdiff_t>(cut));
                begin = cut + 1;
            } else {
                end = std::max(end, begin + 1);  // always make progress
                rows.emplace_back(line.begin() + static_cast<std::ptrdiff_t>(begin),
                                  line.begin() + static_cast<std::ptrdiff_t>(end));
                begin = end;
            }
        }
        line.clear();
    };
    for (const Cell &cell : block.cells) {
        if (cell.text == "\n") {
            wrap();
        } else {
            line.push_back(&cell);
        }
    }
    wrap();
    return rows;
}

// ---- Terminal -------------------------------------------------------------------------

std::string rgb(uint32_t bgr) {
    return std::to_string(bgr & 0xFF) + ";" + std::to_string((bgr >> 8) & 0xFF) + ";" +
           std::to_string((bgr >> 16) & 0xFF);
}

// The select-graphic-rendition sequence of a look; empty for the default look.
std::string sgr(const Look &look) {
    std::string codes;
    auto add = [&codes](const std::string &code) { codes += (codes.empty() ? "" : ";") + code; };
    if (look.bold || look.mark) {
        add("1");
    }
    if (look.italic || look.inserted) {
        add("3");
    }
    if (look.underline) {
        add("4");
    }
    if (look.hasForeground) {
        add("38;2;" + rgb(look.foreground));
    }
    if (look.hasBackground) {
        add("48;2;" + rgb(look.background));
    }
    return codes.empty() ? std::string() : "\x1b[" + codes + "m";
}

constexpr const char *kReset = "\x1b[0m";

void writeColourRow(const Row &row, std::ostream &out) {
    std::string current;
    for (const Cell *cell : row) {
        const std::string wanted = sgr(cell->look);
        if (wanted != current) {
            if (!current.empty()) {
                out << kReset;
            }
            out << wanted;
            current = wanted;
        }
        out << cell->text;
    }
    if (!current.empty()) {
        out << kReset;
    }
    out << '\n';
}

char underMark(const Look &look) {
    if (look.highlighted) {
        const char letter = keyLetter(look.key < 0 ? 0 : look.key);
        return look.underline && letter != '*' ? static_cast<char>(letter - 'a' + 'A') : letter;
    }
    return look.underline ? '~' : ' ';
}

void writePlainRow(const Row &row, std::ostream &out) {
    std::string text;
    std::string under;
    for (const Cell *cell : row) {
        text += cell->text;
        under.append(static_cast<std::size_t>(columnsOf(cell->text)), underMark(cell->look));
    }
    out << text << '\n';
    under.erase(under.find_last_not_of(' ') + 1);
    if (!under.empty()) {
        out << under << '\n';
    }
}

std::string padded(const std::string &text, std::size_t width) {
    const auto columns = static_cast<std::size_t>(columnsOf(text));
    return columns >= width ? text : text + std::string(width - columns, ' ');
}

// The key to the marks, then one line per annotation of the file.
void renderLegend(const Page &page, std::ostream &out, bool colour) {
    out << '\n';
    out << "Marks: " << kOpenText << "\u2026" << kCloseText << " inserted text, "
        << kMarkPlaceholder << " placeholder, " << kMarkPoint << " point, " << kMarkValue
        << " value, " << kMarkCut << " cut marker" << (colour ? "; underlined: range.\n" : ".\n");
    if (!colour) {
        out << "Under the text: a-z highlight colours (capital: also in a range), ~ range.\n";
    }

    out << "\nAnnotations\n";
    std::size_t numberWidth = 0;
    std::size_t kindWidth = 0;
    std::size_t whereWidth = 0;
    for (const LegendLine &line : page.legend) {
        numberWidth = std::max(numberWidth, std::to_string(line.number).size() + 2);  // "[n]"
        kindWidth = std::max(kindWidth, line.kind.size());
        whereWidth = std::max(whereWidth, line.where.size());
    }
    for (const LegendLine &line : page.legend) {
        // The key letter of a highlight, drawn in its colours on a colour terminal.
        std::string key = colour ? "    " : "   ";
        if (line.key >= 0) {
            const ColourKey &colourKey = page.keys[static_cast<std::size_t>(line.key)];
            key = colour ? sgr(colourKey.look) + " " + colourKey.letter + " " + kReset + " "
                         : std::string(1, colourKey.letter) + "  ";
        }
        std::string number = "[";
        number += std::to_string(line.number);
        number += ']';
        std::string text = "  ";
        text += padded(number, numberWidth);
        text += "  ";
        text += padded(line.kind, kindWidth);
        text += "  ";
        text += padded(line.where, whereWidth);
        text += "  ";
        text += key;
        text += line.detail;
        if (!line.label.empty()) {
            text += "  \"" + line.label + "\"";
        }
        text.erase(text.find_last_not_of(' ') + 1);
        out << text << '\n';
    }
}

}  // namespace

void renderTerminal(const Page &page, std::ostream &out, uint32_t width, bool colour) {
    bool firstBlock = true;
    for (const Block &block : page.blocks) {
        if (!firstBlock) {
            out << '\n';
        }
        firstBlock = false;
        for (const Row &row : layOut(block, width)) {
            if (colour) {
                writeColourRow(row, out);
            } else {
                writePlainRow(row, out);
            }
        }
    }
    if (page.legend.empty()) {
        out << "\nAnnotations: none\n";
    } else {
        renderLegend(page, out, colour);
    }
    if (page.hoverAsked) {
        out << "\nHover events\n";
        for (const std::string &line : page.hover) {
            out << "  " << line << '\n';
        }
    }
}

// ---- HTML -----------------------------------------------------------------------------

namespace {

std::string escaped(const std::string &text) {
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        switch (c) {
            case '&':
                out += "&amp;";
                break;
            case '<':
                out += "&lt;";
                break;
            case '>':
                out += "&gt;";
                break;
            case '"':
                out += "&quot;";
                break;
            default:
                out += c;
        }
    }
    return out;
}

std::string hex(uint32_t bgr) {
    static const char digits[] = "0123456789abcdef";
    std::string text = "#";
    for (const uint32_t byte : {bgr & 0xFF, (bgr >> 8) & 0xFF, (bgr >> 16) & 0xFF}) {
        text += digits[byte >> 4];
        text += digits[byte & 0xF];
    }
    return text;
}

// The opening tag of a span drawn in `look`; empty for the default look.
std::string spanOpen(const Look &look) {
    std::string style;
    if (look.hasForeground) {
        style += "color:" + hex(look.foreground) + ";";
    }
    if (look.hasBackground) {
        style += "background-color:" + hex(look.background) + ";";
    }
    if (look.bold) {
        style += "font-weight:bold;";
    }
    if (look.italic) {
        style += "font-style:italic;";
    }
    if (look.underline) {
        style += "text-decoration:underline;";
    }
    std::string classes;
    if (look.inserted) {
        classes += "ins";
    }
    if (look.mark) {
        classes += classes.empty() ? "mark" : " mark";
    }
    if (look.highlighted && look.key >= 0) {
        classes += (classes.empty() ? "hl-" : " hl-") + std::string(1, keyLetter(look.key));
    }
    if (style.empty() && classes.empty()) {
        return {};
    }
    std::string tag = "<span";
    if (!classes.empty()) {
        tag += " class=\"" + classes + "\"";
    }
    if (!style.empty()) {
        style.pop_back();
        tag += " style=\"" + style + "\"";
    }
    return tag + ">";
}

constexpr const char *kHtmlHead = R"(<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<title>anview: %TITLE%</title>
<style>
body { font-family: Georgia, "DejaVu Serif", serif; max-width: 46em; margin: 2em auto; padding: 0 1em; line-height: 1.6; color: #222; }
h1 { font-size: 1.3em; font-weight: normal; color: #555; }
h2 { font-size: 1.1em; margin-top: 2em; }
p.text { white-space: pre-wrap; }
p.cut { color: #888; letter-spacing: 0.3em; }
.ins { font-style: italic; color: #6a3d9a; }
.mark { font-weight: bold; color: #c62828; }
table.legend { border-collapse: collapse; }
table.legend td, table.legend th { padding: 0.2em 0.8em; text-align: left; vertical-align: top; }
table.legend th { border-bottom: 1px solid #ccc; }
table.legend td:nth-child(3) { white-space: nowrap; }
.swatch { font-family: monospace; padding: 0 0.3em; }
p.marks { color: #555; font-size: 0.9em; }
</style>
</head>
<body>
)";

}  // namespace

void renderHtml(const Page &page, std::ostream &out) {
    std::string head = kHtmlHead;
    head.replace(head.find("%TITLE%"), 7, escaped(page.title));
    out << head;
    out << "<h1>" << escaped(page.title) << "</h1>\n<div class=\"doc\">\n";
    for (const Block &block : page.blocks) {
        out << (block.cut ? "<p class=\"cut\">" : "<p class=\"text\">");
        std::size_t i = 0;
        while (i < block.cells.size()) {
            // A span for each run of cells drawn alike.
            const Look &look = block.cells[i].look;
            std::string text;
            std::size_t j = i;
            while (j < block.cells.size() && block.cells[j].look.sameStyle(look) &&
                   block.cells[j].look.key == look.key) {
                text += block.cells[j].text;
                ++j;
            }
            const std::string open = spanOpen(look);
            out << open << escaped(text) << (open.empty() ? "" : "</span>");
            i = j;
        }
        out << "</p>\n";
    }
    out << "</div>\n";
    out << "<p class=\"marks\">Marks: " << kOpenText << "\u2026" << kCloseText << " inserted text, "
        << kMarkPlaceholder << " placeholder, " << kMarkPoint << " point, " << kMarkValue
        << " value, " << kMarkCut << " cut marker; underlined: range.</p>\n";

    out << "<h2>Annotations</h2>\n";
    if (page.legend.empty()) {
        out << "<p>None.</p>\n";
    } else {
        out << "<table class=\"legend\">\n<tr><th>#</th><th>type</th><th>where</th>"
               "<th>details</th><th>label</th></tr>\n";
        for (const LegendLine &line : page.legend) {
            out << "<tr><td>" << line.number << "</td><td>" << escaped(line.kind) << "</td><td>"
                << escaped(line.where) << "</td><td>";
            if (line.key >= 0) {
                const ColourKey &key = page.keys[static_cast<std::size_t>(line.key)];
                Look swatch = key.look;
                swatch.key = line.key;
                const std::string open = spanOpen(swatch);
                out << (open.empty() ? "<span>" : open) << "<span class=\"swatch\">" << key.letter
                    << "</span></span> ";
            }
            out << escaped(line.detail) << "</td><td>" << escaped(line.label) << "</td></tr>\n";
        }
        out << "</table>\n";
    }
    if (page.hoverAsked) {
        out << "<h2>Hover events</h2>\n<ul>\n";
        for (const std::string &line : page.hover) {
            out << "<li>" << escaped(line) << "</li>\n";
        }
        out << "</ul>\n";
    }
    out << "</body>\n</html>\n";
}

}  // namespace anview
