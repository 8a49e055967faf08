// Loads UTF-8 text into a document: paragraphs, their text, and cut items.
//
// Lines end with LF, CR LF or CR. A line that is empty or holds only spaces and tabs
// is blank and ends the paragraph before it. A line that is exactly "---" ends the
// paragraph and becomes a cut item; so does a form feed, wherever it stands in a line
// (the text before it ends that line, the text after it starts a new one). A leading
// byte order mark is dropped. A paragraph longer than a chunk's characters is held by
// several consecutive text items.
#include <algorithm>
#include <exception>
#include <fstream>
#include <iterator>
#include <string>

#include "model.h"

namespace antk {
namespace {

// Decodes strict UTF-8 (no overlong forms, surrogates or values past U+10FFFF) into
// UTF-16. On failure, `bad` is the offset of the first byte that is not valid.
bool decodeUtf8(std::string_view in, std::u16string &out, std::size_t &bad) {
    out.clear();
    out.reserve(in.size());
    std::size_t i = 0;
    if (in.substr(0, 3) == "\xEF\xBB\xBF") {
        i = 3;
    }
    while (i < in.size()) {
        const auto b0 = static_cast<unsigned char>(in[i]);
        if (b0 < 0x80) {
            out.push_back(b0);
            ++i;
            continue;
        }
        std::size_t len;
        uint32_t cp;
        if (b0 >= 0xC2 && b0 <= 0xDF) {
            len = 2;
            cp = b0 & 0x1Fu;
        } else if (b0 >= 0xE0 && b0 <= 0xEF) {
            len = 3;
            cp = b0 & 0x0Fu;
        } else if (b0 >= 0xF0 && b0 <= 0xF4) {
            len = 4;
            cp = b0 & 0x07u;
        } else {
            bad = i;
            return false;
        }
        for (std::size_t k = 1; k < len; ++k) {
            if (i + k >= in.size()) {
                bad = i + k;
                return false;
            }
            const auto b = static_cast<unsigned char>(in[i + k]);
            if ((b & 0xC0) != 0x80) {
                bad = i + k;
                return false;
            }
            cp = (cp << 6) | (b & 0x3Fu);
            // Reject overlong forms, surrogates and values past U+10FFFF at the second
            // byte already, where they become certain.
            if (k == 1) {
                const bool overlong =
                    (len == 3 && b0 == 0xE0 && b < 0xA0) || (len == 4 && b0 == 0xF0 && b < 0x90);
                const bool surrogate = len == 3 && b0 == 0xED && b >= 0xA0;
                const bool tooBig = len == 4 && b0 == 0xF4 && b >= 0x90;
                if (overlong || surrogate || tooBig) {
                    bad = i + 1;
                    return false;
                }
            }
        }
        if (cp >= 0x10000) {
            cp -= 0x10000;
            out.push_back(static_cast<char16_t>(0xD800 + (cp >> 10)));
            out.push_back(static_cast<char16_t>(0xDC00 + (cp & 0x3FF)));
        } else {
            out.push_back(static_cast<char16_t>(cp));
        }
        i += len;
    }
    return true;
}

bool blank(const std::u16string &line) {
    for (const char16_t u : line) {
        if (u != u' ' && u != u'\t') {
            return false;
        }
    }
    return true;
}

class Loader {
 public:
    explicit Loader(uint32_t maxItemsPerChunk) : builder_(maxItemsPerChunk) {}

    DAHandle load(const std::u16string &text) {
        for (std::size_t i = 0; i < text.size(); ++i) {
            const char16_t u = text[i];
            if (u == u'\n') {
                endLine();
            } else if (u == u'\r') {
                if (i + 1 < text.size() && text[i + 1] == u'\n') {
                    ++i;
                }
                endLine();
            } else if (u == u'\f') {
                if (!line_.empty()) {
                    endLine();
                }
                endParagraph();
                builder_.cutItem();
            } else {
                line_.push_back(u);
            }
        }
        if (!line_.empty()) {
            endLine();
        }
        endParagraph();
        return builder_.build();
    }

 private:
    void endLine() {
        if (line_ == u"---") {
            endParagraph();
            builder_.cutItem();
        } else if (blank(line_)) {
            endParagraph();
        } else {
            if (inParagraph_) {
                paragraph_.push_back(u'\n');
            }
            paragraph_ += line_;
            inParagraph_ = true;
        }
        line_.clear();
    }

    void endParagraph() {
        if (!inParagraph_) {
            return;
        }
        builder_.item(kItemParagraph);
        std::u16string_view rest(paragraph_);
        while (!rest.empty()) {
            std::size_t take = std::min<std::size_t>(rest.size(), detail::kMaxChunkChars);
            // Keep a surrogate pair in one text item.
            if (take < rest.size() && rest[take - 1] >= 0xD800 && rest[take - 1] <= 0xDBFF) {
                --take;
            }
            builder_.textItem(rest.substr(0, take));
            rest.remove_prefix(take);
        }
        paragraph_.clear();
        inParagraph_ = false;
    }

    DocumentBuilder builder_;
    std::u16string line_;
    std::u16string paragraph_;
    bool inParagraph_ = false;
};

void setError(std::string *error, const std::string &message) {
    if (error != nullptr) {
        *error = message;
    }
}

DAHandle loadDecoded(std::string_view utf8, std::string *error, uint32_t maxItemsPerChunk,
                     const std::string &what) {
    std::u16string text;
    std::size_t bad = 0;
    if (!decodeUtf8(utf8, text, bad)) {
        setError(error, what + "invalid UTF-8 at byte offset " + std::to_string(bad));
        return nullptr;
    }
    try {
        Loader loader(maxItemsPerChunk);
        return loader.load(text);
    } catch (const std::exception &e) {
        setError(error, what + "cannot build the document: " + e.what());
        return nullptr;
    }
}

}  // namespace

DAHandle loadText(std::string_view utf8, std::string *error, uint32_t maxItemsPerChunk) {
    return loadDecoded(utf8, error, maxItemsPerChunk, std::string());
}

DAHandle loadTextFile(const std::string &path, std::string *error, uint32_t maxItemsPerChunk) {
    std::ifstream in(path, std::ios::binary);
    if (!in) {
        setError(error, path + ": cannot open the file");
        return nullptr;
    }
    std::string bytes;
    try {
        bytes.assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
    } catch (const std::exception &e) {
        setError(error, path + ": cannot read the file: " + e.what());
        return nullptr;
    }
    if (in.bad()) {
        setError(error, path + ": cannot read the file");
        return nullptr;
    }
    return loadDecoded(bytes, error, maxItemsPerChunk, path + ": ");
}

}  // namespace antk
