// The built-in sample: a short document and an annotation set that shows every kind of
// annotation anview draws. The annotations are in the annotation file format (README).
#include "sample.h"

namespace anview {

const char *const kSampleText =
    R"(Welcome to anview, the viewer of the anno library. This paragraph shows highlights: a document style, a global style, and plain colour words from the sixteen-colour palette. A short phrase nested inside a longer highlight takes over where it lies.

Annotations can insert text into the document: it is drawn between angle brackets before the character it hangs at, and a placeholder inside it shows as a box. Point annotations and value annotations mark single characters with dots.

A range annotation begins in this paragraph and runs on across the cut below,
---
so the library stores it in two pieces with a cut marker at the cut, and the viewer underlines both pieces. A cut marker can also be set by hand, like this one.
)";

const char *const kSampleAnnotations = R"({
  "styles": [
    {"id": 7, "scope": "document", "foreground": "#1b1b1b", "background": "#ffd54f", "bold": true},
    {"id": 1, "scope": "global", "foreground": "#ffffff", "background": "#2e7d32"},
    {"id": 2, "scope": "global", "background": "#cfe3ff", "italic": true}
  ],
  "annotations": [
    {"type": "highlight", "start": 11, "end": 17, "style": 7, "label": "the tool"},
    {"type": "highlight", "start": 86, "end": 100, "style": 7},
    {"type": "highlight", "start": 104, "end": 116, "style": 1, "events": ["enter"]},
    {"type": "highlight", "start": 122, "end": 140, "foreground": "yellow", "background": "dark blue"},
    {"type": "highlight", "start": 174, "end": 247, "style": 2, "label": "outer"},
    {"type": "highlight", "start": 189, "end": 195, "foreground": "white", "background": "dark red", "label": "inner"},
    {"type": "text", "at": 328, "text": "like this", "label": "inserted"},
    {"type": "placeholder", "at": 328, "index": 4},
    {"type": "point", "at": 407, "value": 1},
    {"type": "value", "at": 429, "value": 42},
    {"type": "range", "start": 482, "end": 663, "label": "across the cut"},
    {"type": "cutmark", "at": 703}
  ]
}
)";

}  // namespace anview
