// The stand-in's own records: the document model shared by a document and every
// document opened over its content, the handles the module functions hand out, and
// the call bookkeeping every module function starts with.
#ifndef ANNO_TOOLKIT_MODEL_H
#define ANNO_TOOLKIT_MODEL_H

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "anno/toolkit.h"
#include "hosts/modules.h"

namespace antk::detail {

constexpr uint32_t kNoText = 0xFFFFFFFFu;
constexpr uint32_t kNoId = 0xFFFFFFFFu;
constexpr uint32_t kMaxChunkChars = 65536;
constexpr uint32_t kMaxChunkItems = 65536;
constexpr uint32_t kMaxChunks = 65535;  // chunk 0xFFFF would make the id 0xFFFFFFFF possible
constexpr uint32_t kNotTakenFlag = 0x10000;

struct ItemRec {
    uint32_t type = 0;
    uint32_t field2 = 0;
    uint32_t field3 = 0;
    uint32_t text = kNoText;  // index into Model::texts for items made by textItem()
    uint32_t spanFlags = 0;   // hidden text: the span flags, or 0 for a not-taken piece
    bool hidden = false;
};

struct ChunkRec {
    std::vector<ItemRec> items;
    uint32_t charCount = 0;
    uint32_t firstChar = 0;  // document-wide ordinal of the chunk's first character
    uint32_t firstItem = 0;  // document-wide ordinal of the chunk's first item
};

struct SectionRec {
    uint32_t firstChunk;
    uint32_t lastChunk;
};

struct RangeRec {
    uint32_t firstItem;
    uint32_t code;
};

struct Model;

inline uint32_t makeId(uint32_t chunk, uint32_t index) { return (chunk << 16) | index; }
inline uint32_t chunkOf(uint32_t id) { return id >> 16; }
inline uint32_t indexOf(uint32_t id) { return id & 0xFFFFu; }

}  // namespace antk::detail

// The chunker of one document model; every document over that content shares it.
struct CHChunker {
    antk::detail::Model *model = nullptr;
};

namespace antk::detail {

struct Model : std::enable_shared_from_this<Model> {
    std::vector<ChunkRec> chunks;
    std::vector<std::u16string> texts;
    std::vector<SectionRec> sections;
    std::vector<RangeRec> ranges;
    uint32_t option = 0;
    bool hasChunker = true;
    uint32_t totalChars = 0;
    uint32_t totalItems = 0;
    CHChunker chunker;

    Model() { chunker.model = this; }
    Model(const Model &) = delete;
    Model &operator=(const Model &) = delete;

    const ItemRec *findItem(uint32_t id) const {
        const uint32_t c = chunkOf(id);
        if (c >= chunks.size() || indexOf(id) >= chunks[c].items.size()) {
            return nullptr;
        }
        return &chunks[c].items[indexOf(id)];
    }
    // Computes the ordinals once every item is in.
    void finish();
};

}  // namespace antk::detail

// The record that owns a document's module data. The lock is re-entrant on one thread
// and an unlock without a lock is ignored, so a caller that unlocks after a failed
// lock does no harm.
struct DARetrieved {
    DADocument *doc = nullptr;
    void *slots[ANMOD_SLOT_COUNT] = {};
    std::atomic<bool> destroyed{false};

    std::mutex mutex;
    std::condition_variable released;
    std::thread::id owner;
    unsigned depth = 0;

    void lock();
    void unlock();
};

struct DADocument {
    std::shared_ptr<antk::detail::Model> model;
    DARetrieved retrieved;
    bool secondary = false;
    std::atomic<uint32_t> charSet{antk::kDefaultOSCharSet};
};

// A reader over one document model. It stays valid after its document is closed,
// since it keeps the model alive.
struct CAContent {
    std::shared_ptr<const antk::detail::Model> model;
    uint32_t charSet = antk::kDefaultOSCharSet;
    uint32_t chunk = 0;   // chunk being read
    uint32_t item = 0;    // index of the next item to report in that chunk
    uint32_t offset = 0;  // units of the current text item already delivered
    uint32_t phase = 0;   // hidden text in a span: 0 start marker, 1 piece, 2 end marker
    bool atEnd = false;
};

namespace antk::detail {

// Codes the module functions fail with by themselves.
constexpr uint32_t kErrBadArgument = antk::kErrBadArgument;
constexpr uint32_t kErrNotFound = antk::kErrNotFound;
constexpr uint32_t kErrNoRoom = antk::kErrNoRoom;
constexpr uint32_t kErrNoMemory = antk::kErrNoMemory;

// Counts a call of `fn`; true when an injected failure hits it, with its code in `code`.
bool failing(Fn fn, uint32_t &code) noexcept;

// Removes the hook of setContentReadHook.
void clearContentReadHook();

extern std::atomic<int> openSecondaryCount;
extern std::atomic<int> openContentCount;

}  // namespace antk::detail

#endif  // ANNO_TOOLKIT_MODEL_H
