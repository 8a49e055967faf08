// Mapping between document-wide character ordinals and positions. Each chunk's
// characters are mapped to the items that hold them by reading the chunk's content
// through a second document; the two most recently used maps stay cached.
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "anno/anno.h"
#include "binding/instance.h"
#include "hosts/modules.h"
#include "hosts/platform.h"

namespace {

constexpr uint32_t kChunkShift = 16;
constexpr uint32_t kNoRun = 0xFFFFFFFF;  // handed on when the chunker names no run
// A character id holds its index within the chunk in 16 bits: no chunk has more.
constexpr uint32_t kMaxChunkChars = 0x10000;
constexpr uint32_t kRunCharIds = 2;  // CHGetRunInfo mode: first and last character ids
constexpr uint32_t kRunItemIds = 0;  // CHGetRunInfo mode: first and last item ids
constexpr size_t kMapEntryBytes = sizeof(uint32_t);
constexpr size_t kScratchBytesPerChar = 2;  // room for the widest character set
constexpr uint32_t kWideBytesPerChar = 2;
constexpr uint32_t kLastSection = 0xFFFFFFFF;  // a chunker that never runs out is cut off here
// A chunk has at most 65536 items (an item index has 16 bits), and the content module
// reports each in at most three reads (span start, piece, span end) besides the reads
// of its characters: a reader that goes on past that has met a module that never ends.
constexpr uint64_t kMaxChunkItems = 0x10000;
constexpr uint64_t kReadsPerItem = 3;

constexpr ANCharMap kEmptyMap = {ANMAP_NO_CHUNK, nullptr, 0, 0};

uint32_t ANChunkOf(uint32_t id) { return id >> kChunkShift; }
uint32_t ANChunkStart(uint32_t chunk) { return chunk << kChunkShift; }

bool ANIsHiddenSpan(uint32_t flags) {
    return flags == ANMOD_SPAN_HIDDEN_A || flags == ANMOD_SPAN_HIDDEN_B ||
           flags == ANMOD_SPAN_HIDDEN_C;
}

uint32_t ANMin(uint64_t a, uint32_t b) { return a < b ? static_cast<uint32_t>(a) : b; }

// The number of characters of the chunk starting at c0, 0 when the chunker cannot
// say (the map is then made without a block).
uint32_t ANChunkCharCount(const ANInstance *instance, uint32_t c0) {
    CHSectionInfo sectionInfo{};
    uint32_t section = 0;
    for (;; ++section) {
        if (section == kLastSection) return 0;
        if (CHGetSectionInfo(instance->chunker, section, &sectionInfo) != 0) return 0;
        if (sectionInfo.field3 >= c0) break;
    }
    uint32_t run = kNoRun;
    CHGetRunFromItemId(instance->chunker, c0, &run);
    CHRunInfo runInfo{};
    if (CHGetRunInfo(instance->chunker, run, kRunCharIds, &runInfo) != 0) return 0;
    uint32_t sectionId = 0;
    if (CHGetItemId(instance->chunker, ANMOD_CLASS_SECTION, section, &sectionId) != 0) return 0;
    CHItemInfo item{};
    if (CHGetItem(instance->chunker, ANMOD_CLASS_SECTION, sectionId, &item, nullptr) != 0) {
        return 0;
    }
    // A run without characters reports its last id just before its first.
    if (runInfo.field3 < runInfo.field2) return 0;
    const uint64_t count = static_cast<uint64_t>(runInfo.field3) - runInfo.field2 + 1;
    return ANMin(count, kMaxChunkChars);
}

// Opens the document's content on first use. Returns 18 when this attempt failed;
// after that no attempt is made again and the content stays closed.
uint32_t ANOpenContent(ANInstance *instance) {
    if (instance->contentDoc != nullptr || (instance->contentFailed & ANCONTENT_FAILED) != 0) {
        return AN_OK;
    }
    CHHandle chunker = instance->chunker;
    if (DAOpenDocument(&instance->contentDoc, ANMOD_OPEN_FROM_CHUNKER, &chunker, 0) != 0) {
        instance->contentDoc = nullptr;
        instance->contentFailed |= ANCONTENT_FAILED;
        return AN_ERR_NOSTATE;
    }
    const uint32_t charSet = instance->charSet;
    if (DASetOption(instance->contentDoc, ANMOD_SETOPT_CHARSET, &charSet, sizeof charSet) != 0 ||
        CAOpenContent(instance->contentDoc, &instance->content) != 0) {
        DACloseDocument(instance->contentDoc);
        instance->contentDoc = nullptr;
        instance->content = nullptr;
        instance->contentFailed |= ANCONTENT_FAILED;
        return AN_ERR_NOSTATE;
    }
    CAReadRecord rewind{};
    rewind.size = sizeof(CAReadRecord);
    CAReadFirst(instance->content, &rewind);
    return AN_OK;
}

// Reads the content from the reader's place to its end and records, for each
// character, the index of its item: at most `capacity` entries. Text goes to
// `scratch` (`room` bytes); whatever the module reports, nothing is written outside
// either buffer. Returns the number of characters recorded; *endless is set when the
// module went on past what the chunk can hold without reporting the end.
uint32_t ANReadPieces(ANInstance *instance, uint32_t *entries, uint32_t capacity,
                      unsigned char *scratch, uint32_t room, bool *endless) {
    CAReadRecord read{};
    unsigned char *cursor = scratch;
    uint32_t recorded = 0;
    uint32_t oddPieces = 0;
    bool inHiddenSpan = false;
    const uint64_t maxReads = capacity + kMaxChunkItems * kReadsPerItem + 1;
    for (uint64_t reads = 0;; ++reads) {
        if (reads == maxReads) {
            *endless = true;
            break;
        }
        read.size = sizeof(CAReadRecord);
        read.room = room;
        read.buffer = cursor;
        if (CAReadNext(instance->content, &read) != 0 || read.type == ANMOD_READ_END) break;
        if (read.type == ANMOD_READ_SPAN_START && ANIsHiddenSpan(read.flags)) {
            inHiddenSpan = true;
        } else if (read.type == ANMOD_READ_SPAN_END && ANIsHiddenSpan(read.flags)) {
            inHiddenSpan = false;
        } else if (read.type == ANMOD_READ_TEXT) {
            const uint32_t count = ANMin(read.charCount, capacity - recorded);
            for (uint32_t i = 0; i < count; ++i) entries[recorded++] = read.itemIndex;

            // Text the module did not write is filled in here, as wide as it would have been.
            const bool taken = !inHiddenSpan && (read.flags & ANMOD_READ_NOT_TAKEN) == 0;
            const uint64_t perChar = read.charSet == ANMOD_CHARSET_WIDE ? kWideBytesPerChar : 1;
            const uint64_t size = taken ? read.written : read.charCount * perChar;
            const uint32_t step = ANMin(size, room);
            if (!taken && step != 0) std::memset(cursor, 0, step);
            cursor += step;
            room -= step;
            if ((step & 1) != 0) ++oddPieces;
        }
    }
    // The text is padded to an even byte count, within the buffer.
    if ((oddPieces & 1) != 0 && room != 0) *cursor = 0;
    return recorded;
}

// Makes the map of `chunk` in `map` (which starts empty). Returns 0; 13 out of memory;
// 15 a block that cannot be locked; 18 the content could not be opened (the map is
// then kept without characters); 25 the chunker does not know where the chunk's
// characters start, or the content module never reported the chunk's end. On a
// result other than 0 and 18, `map` has no block.
uint32_t ANReadCharMap(ANInstance *instance, uint16_t chunk, ANCharMap *map) {
    const uint32_t c0 = ANChunkStart(chunk);
    uint32_t base = 0;
    if (CHGetItemCountById(instance->chunker, ANMOD_CLASS_CHAR, c0, &base) != 0) {
        return AN_ERR_NOTFOUND;
    }
    map->base = base;

    const uint32_t n = ANChunkCharCount(instance, c0);
    HGLOBAL block = nullptr;
    HGLOBAL scratch = nullptr;
    if (n != 0) {
        block = GlobalAlloc(GMEM_MOVEABLE, n * kMapEntryBytes);
        if (block == nullptr) return AN_ERR_NOMEM;
        scratch = GlobalAlloc(GMEM_MOVEABLE, n * kScratchBytesPerChar);
        if (scratch == nullptr) {
            GlobalFree(block);
            return AN_ERR_NOMEM;
        }
    }

    const uint32_t rc = ANOpenContent(instance);
    uint32_t recorded = 0;
    if ((instance->contentFailed & ANCONTENT_FAILED) == 0) {
        const uint32_t start[4] = {c0, ANPOS_NOSUBITEM, 0, 0};
        CASeek(instance->content, start);
        uint32_t *entries = nullptr;
        unsigned char *text = nullptr;
        if (block != nullptr) {
            entries = static_cast<uint32_t *>(GlobalLock(block));
            text = static_cast<unsigned char *>(GlobalLock(scratch));
            if (entries == nullptr || text == nullptr) {
                if (entries != nullptr) GlobalUnlock(block);
                if (text != nullptr) GlobalUnlock(scratch);
                GlobalFree(scratch);
                GlobalFree(block);
                return AN_ERR_BADARG;
            }
        }
        bool endless = false;
        recorded = ANReadPieces(
            instance, entries, entries == nullptr ? 0 : n, text,
            text == nullptr ? 0 : static_cast<uint32_t>(n * kScratchBytesPerChar), &endless);
        if (block != nullptr) {
            GlobalUnlock(scratch);
            GlobalUnlock(block);
        }
        if (endless) {  // no map from such a read: it is tried again next time
            if (block != nullptr) {
                GlobalFree(scratch);
                GlobalFree(block);
            }
            return AN_ERR_NOTFOUND;
        }
    }
    if (block != nullptr) {
        GlobalFree(scratch);
        map->block = block;
        map->length = recorded;
    }
    return rc;
}

// Gives a copy of the map of `chunk`, read when it is not cached. The chunk's record
// becomes the most recently used; a map that falls out of the cache is freed.
uint32_t ANLookupCharMap(ANInstance *instance, uint16_t chunk, ANCharMap *out) {
    ANCharMap *cache = instance->mapCache;
    if (cache[1].chunk == chunk) {
        const ANCharMap older = cache[1];
        cache[1] = cache[0];
        cache[0] = older;
    } else if (cache[0].chunk != chunk) {
        // An empty first record (after a failed read) is made again in place rather
        // than pushing out the map behind it.
        if (cache[0].chunk != ANMAP_NO_CHUNK) {
            if (cache[1].block != nullptr) GlobalFree(cache[1].block);
            cache[1] = cache[0];
        }
        cache[0] = kEmptyMap;
        cache[0].chunk = chunk;
        const uint32_t rc = ANReadCharMap(instance, chunk, &cache[0]);
        if (rc != AN_OK) {
            // Unreadable content stays cached; anything else is tried again next time.
            if (rc != AN_ERR_NOSTATE) cache[0] = kEmptyMap;
            return rc;
        }
    }
    *out = cache[0];
    return AN_OK;
}

uint32_t ANOrdinalToPos(ANInstance *instance, ANMapRecord *map) {
    const uint32_t ordinal = map->ordinal;
    const ANCharMap &recent = instance->mapCache[0];
    uint32_t chunk = recent.chunk;
    if (recent.block == nullptr || ordinal < recent.base ||
        ordinal - recent.base >= recent.length) {
        uint32_t charId = 0;
        if (CHGetItemId(instance->chunker, ANMOD_CLASS_CHAR, ordinal, &charId) != 0) {
            return AN_ERR_NOTFOUND;
        }
        chunk = ANChunkOf(charId);
        // The chunk's map is at hand and does not reach the ordinal.
        if (chunk == recent.chunk && recent.block != nullptr && recent.base <= ordinal) {
            return AN_ERR_NOTFOUND;
        }
    }
    if (chunk == ANMAP_NO_CHUNK) return AN_ERR_NOTFOUND;

    ANCharMap charMap{};
    const uint32_t rc = ANLookupCharMap(instance, static_cast<uint16_t>(chunk), &charMap);
    if (rc != AN_OK) return rc;
    if (charMap.length == 0) return AN_OK;
    if (ordinal < charMap.base || ordinal - charMap.base >= charMap.length) return AN_ERR_NOTFOUND;
    const uint32_t i = ordinal - charMap.base;
    const auto *entries = static_cast<const uint32_t *>(GlobalLock(charMap.block));
    if (entries == nullptr) return AN_ERR_BADARG;
    const uint32_t itemId = ANChunkStart(chunk) | entries[i];
    CHItemInfo item{};
    const bool plainItem =
        CHGetItem(instance->chunker, ANMOD_CLASS_ITEM, itemId, &item, nullptr) == 0 &&
        item.field1 != ANMOD_ITEM_TEXT;
    map->pos.itemId = itemId;
    map->pos.subItemId = plainItem ? ANPOS_NOSUBITEM : (ANChunkStart(chunk) | i);
    GlobalUnlock(charMap.block);
    return AN_OK;
}

uint32_t ANPosToOrdinal(ANInstance *instance, ANMapRecord *map) {
    uint32_t run = kNoRun;
    CHGetRunFromItemId(instance->chunker, map->pos.itemId, &run);
    CHRunInfo runInfo{};
    if (CHGetRunInfo(instance->chunker, run, kRunItemIds, &runInfo) != 0) return AN_ERR_NOTFOUND;
    const uint32_t chunk = ANChunkOf(runInfo.field2);
    if (chunk == ANMAP_NO_CHUNK) return AN_ERR_NOTFOUND;
    const uint32_t c0 = ANChunkStart(chunk);
    const uint32_t sub = map->pos.subItemId;
    const uint32_t s = sub == ANPOS_NOSUBITEM ? ANPOS_NOSUBITEM : sub - c0;
    const uint32_t k = map->pos.itemId - c0;

    ANCharMap charMap{};
    if (ANLookupCharMap(instance, static_cast<uint16_t>(chunk), &charMap) != AN_OK) {
        return AN_ERR_BADARG;
    }
    if (charMap.length == 0) {
        map->ordinal = charMap.base;
        return AN_OK;
    }
    const auto *entries = static_cast<const uint32_t *>(GlobalLock(charMap.block));
    if (entries == nullptr) return AN_ERR_BADARG;
    uint32_t j = 0;
    if (s != ANPOS_NOSUBITEM && s < charMap.length && entries[s] == k) {
        j = s;
    } else {
        // The item's first character, or the first character after it.
        while (j < charMap.length && entries[j] < k) ++j;
    }
    map->ordinal = charMap.base + j;
    GlobalUnlock(charMap.block);
    return AN_OK;
}

}  // namespace

extern "C" AN_API uint32_t ANMapPosition(DAHandle doc, ANMapRecord *map) {
    ANInstance *instance = nullptr;
    const uint32_t rc = ANFindState(doc, &instance);
    if (rc != AN_OK) return rc;
    if (map == nullptr || map->size != ANMAPRECORD_SIZE) return AN_ERR_BADARG;
    if ((map->flags & ANMAP_ORDINAL_TO_POS) != 0) return ANOrdinalToPos(instance, map);
    if ((map->flags & ANMAP_POS_TO_ORDINAL) != 0) return ANPosToOrdinal(instance, map);
    return AN_ERR_BADARG;
}
