// UTF-8 and UTF-16 conversions for the text anview reads from annotation files and the
// units it reads back from the library.
#ifndef ANVIEW_UTF_H
#define ANVIEW_UTF_H

#include <cstdint>
#include <string>
#include <string_view>

namespace anview {

// UTF-16 units of valid UTF-8 (as the JSON reader hands strings over); a byte sequence
// that is not valid UTF-8 becomes U+FFFD.
std::u16string toUtf16(std::string_view utf8);

// Appends the UTF-8 form of one code point; surrogates and values past U+10FFFF become
// U+FFFD.
void appendUtf8(std::string &out, uint32_t codePoint);

inline bool isHighSurrogate(uint32_t unit) { return unit >= 0xD800 && unit <= 0xDBFF; }
inline bool isLowSurrogate(uint32_t unit) { return unit >= 0xDC00 && unit <= 0xDFFF; }
inline uint32_t combineSurrogates(uint32_t high, uint32_t low) {
    return 0x10000 + ((high - 0xD800) << 10) + (low - 0xDC00);
}

}  // namespace anview

#endif  // ANVIEW_UTF_H
