// The in-memory stand-in for the toolkit's sibling modules (data access, utility,
// chunker, content access). It defines every module function the annotation library
// imports, over documents built in memory, and offers tests and tools three ways in:
// a builder, a loader for UTF-8 text files, and failure injection with call counters.
//
// Model. A document is a sequence of items split into chunks. Item ids and character
// ids are (chunk << 16) | index: an item's index within its chunk, a character's index
// among all characters of its chunk's text items. Items are visited in id order
// (class 0); characters of a text item (type 7) are consecutive ids. Each chunk is one
// run. Sections (class 1) group whole chunks. Document ranges (class 16) are
// (first item id, range code) pairs; their end items are ordinary items of type 68
// with field2 = the code, added by the builder's caller.
//
// Section ids are kSectionIdBase + the section's index, range ids kRangeIdBase + the
// range's index. CHGetItem on the document's last item succeeds and gives kNoNextItem
// as the next id. Content: CASeek starts reading at an item (normally a chunk's first)
// and reading ends with that chunk; an item without text is reported as a type-4
// piece. The reader cuts a text item into several pieces of the same item index when
// the caller's room ends inside it, and fails with kErrNoRoom when not one more
// character fits. CAReadFirst rewinds to the document's start and, without a buffer or
// room, reports type 0. Close and unlock calls do their work even when an injected
// failure hits them (only the result changes), so failure sweeps leak nothing;
// UTGetOSCharSet answers an injected failure with the code as its value.
#ifndef ANNO_TOOLKIT_H
#define ANNO_TOOLKIT_H

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "anno/anno.h"

struct CAReadRecord;  // hosts/modules.h

#if defined(_WIN32)
#if defined(ANNO_BUILDING_TOOLKIT)
#define ANTK_API __declspec(dllexport)
#else
#define ANTK_API __declspec(dllimport)
#endif
#else
#define ANTK_API __attribute__((visibility("default")))
#endif

namespace antk {

// Item types with a meaning for the annotation library.
constexpr uint32_t kItemText = 7;
constexpr uint32_t kItemRangeEnd = 68;
constexpr uint32_t kItemSkip = 240;  // 240 and 241 are passed over by range annotations
constexpr uint32_t kItemSkip2 = 241;
constexpr uint32_t kItemParagraph = 1;  // a plain non-text item, used by the loader
constexpr uint32_t kCharSetWide = 0x14B00000;
constexpr uint32_t kDefaultOSCharSet = 1252;

constexpr uint32_t kSectionIdBase = 0x40000000;
constexpr uint32_t kRangeIdBase = 0x60000000;
constexpr uint32_t kNoNextItem = 0xFFFFFFFF;

// Codes the module functions fail with by themselves; injected failures carry their own.
constexpr uint32_t kErrBadArgument = 201;  // null pointer; unknown class, option, kind or mode
constexpr uint32_t kErrNotFound = 202;     // unknown id or index; nothing further
constexpr uint32_t kErrNoRoom = 203;       // content reading: no room for one more character
constexpr uint32_t kErrNoMemory = 204;

// Builds one document. Items go into the current chunk; a chunk is closed by
// newChunk() or automatically when it holds maxItemsPerChunk items or its characters
// would pass 65536.
class ANTK_API DocumentBuilder {
 public:
    explicit DocumentBuilder(uint32_t maxItemsPerChunk = 4096);
    ~DocumentBuilder();
    DocumentBuilder(const DocumentBuilder &) = delete;
    DocumentBuilder &operator=(const DocumentBuilder &) = delete;

    // A non-text item of `type`; returns its id.
    uint32_t item(uint32_t type, uint32_t field2 = 0, uint32_t field3 = 0);
    // A text item (type 7) holding `units`; returns its id. Its characters get
    // consecutive ids from (chunk << 16) | (characters already in the chunk).
    uint32_t textItem(std::u16string_view units);
    uint32_t textItem(std::string_view ascii);  // one unit per byte
    // A cut item: type 0 with field2 1.
    uint32_t cutItem();
    // An item that range annotations pass over (type 240 or 241).
    uint32_t skippedItem(uint32_t type = kItemSkip);
    // Ends the current chunk (no-op when it is empty).
    void newChunk();
    // Ends the current section after the current chunk (which is closed too).
    void newSection();
    // A document range (class 16) starting at `firstItem` with `code`, numbered in
    // the order of these calls. The end item is the caller's: item(68, code).
    void range(uint32_t firstItem, uint32_t code);
    // Makes the item's text not taken when content is read: the reader reports it
    // inside a marked span (types 2 and 3 with flags `spanFlags`), or, when
    // spanFlags is 0, as a piece with bit 0x10000 set.
    void hideItemText(uint32_t itemId, uint32_t spanFlags = 0x10000);
    // Sets the value DAGetOption(338482) reports (bit 0x10 selects wide content).
    void option(uint32_t value);
    // Gives the document no chunker (DAGetHChunker succeeds with null).
    void noChunker();

    // The ids of every character of a text item, in order.
    std::vector<uint32_t> charIds(uint32_t itemId) const;

    // Makes the document; the builder may be reused afterwards only for reading ids.
    DAHandle build();

    struct Impl;

 private:
    Impl *impl_;
};

// Builds a document from UTF-8 text: every paragraph (lines separated by one or more
// blank lines) becomes an item of type kItemParagraph followed by a text item holding
// the paragraph's UTF-16 units (line breaks inside a paragraph become U+000A); a form
// feed, or a line holding only "---", becomes a cut item. Chunks hold at most
// maxItemsPerChunk items. Returns null and sets *error when the text is not UTF-8.
ANTK_API DAHandle loadText(std::string_view utf8, std::string *error = nullptr,
                           uint32_t maxItemsPerChunk = 64);
// Reads a file and loads it as loadText does; null with *error on failure.
ANTK_API DAHandle loadTextFile(const std::string &path, std::string *error = nullptr,
                               uint32_t maxItemsPerChunk = 64);

// Destroys a document made by build() or a loader, with its module data. Documents
// opened through DAOpenDocument must have been closed first.
ANTK_API void destroyDocument(DAHandle doc);

// Every item of the document in id order: (id, type). For tools and tests.
struct ItemView {
    uint32_t id;
    uint32_t type;
    uint32_t firstChar;  // text items
    uint32_t charCount;  // text items
};
ANTK_API std::vector<ItemView> items(DAHandle doc);
// The text units of a text item (empty for other items).
ANTK_API std::u16string itemText(DAHandle doc, uint32_t itemId);

// ---- Failure injection and call counters -----------------------------------------

enum class Fn : int {
    DAGetAnno,
    DARetrieveDocHandle,
    DALockModuleData,
    DAUnlockModuleData,
    DADestroyModuleData,
    DAGetHChunker,
    DAGetOption,
    DAOpenDocument,
    DASetOption,
    DACloseDocument,
    UTGetOSCharSet,
    CHGetItem,
    CHNextItemId,
    CHGetItemId,
    CHGetItemCount,
    CHGetItemCountById,
    CHGetRunFromItemId,
    CHGetRunInfo,
    CHGetSectionInfo,
    CAOpenContent,
    CAReadFirst,
    CAReadNext,
    CASeek,
    CACloseContent,
    Count
};
ANTK_API const char *fnName(Fn fn);

// Calls of `fn` since the last resetCalls().
ANTK_API uint64_t calls(Fn fn);
// Calls of every module function since the last resetCalls().
ANTK_API uint64_t totalCalls();
ANTK_API void resetCalls();

// Makes the n-th call of `fn` from now (n = 1: the next one) fail with `code`; with
// `sticky`, that call and every later one fail. A failing call writes nothing. n = 0
// removes the rule for `fn`.
ANTK_API void failCall(Fn fn, uint64_t n, uint32_t code = 99, bool sticky = false);
// Makes the n-th call of any module function from now fail (for sweeps).
ANTK_API void failAnyCall(uint64_t n, uint32_t code = 99, bool sticky = false);
// Removes every injected failure, and the content-read hook.
ANTK_API void clearFailures();

// Plays a content-access module that reports odd values: `hook` is called after every
// successful CAReadNext has filled the record and may change what it reports (the
// reader's own place is not affected). An empty function removes it.
ANTK_API void setContentReadHook(std::function<void(CAReadRecord *)> hook);

// Slot 151 of a document's module data, for tests that look at the binding.
ANTK_API void *annoSlot(DAHandle doc);
// Whether the document's module data was destroyed by DADestroyModuleData.
ANTK_API bool moduleDataDestroyed(DAHandle doc);
// Number of documents opened with DAOpenDocument and not yet closed, and content
// handles opened and not yet closed, over all documents.
ANTK_API int openSecondaryDocuments();
ANTK_API int openContents();

}  // namespace antk

#endif  // ANNO_TOOLKIT_H
