// Drawing a page: on a terminal (24-bit colour codes, or plain text with the highlights
// and ranges marked on a line under the text) and as an HTML page.
#ifndef ANVIEW_RENDER_H
#define ANVIEW_RENDER_H

#include <cstdint>
#include <ostream>

#include "page.h"

namespace anview {

// Wraps lines at `width` columns. With `colour`, highlights are drawn in their colours,
// ranges underlined; without, a line of key letters ('a' to 'z', capital inside a range)
// and '~' (range) follows each text line that has any.
void renderTerminal(const Page &page, std::ostream &out, uint32_t width, bool colour);

// A complete HTML page: the document with inline styles, the legend and the hover events.
void renderHtml(const Page &page, std::ostream &out);

}  // namespace anview

#endif  // ANVIEW_RENDER_H
