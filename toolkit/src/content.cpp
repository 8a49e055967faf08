// The content-access module: reads one chunk of a document as a stream of pieces.
//
// From the reader's place (a chunk start after CASeek), CAReadNext reports the chunk's
// items in order: a text item's characters as type-1 pieces, an item without text as
// a type-4 piece, and after the chunk's last item type 5, again and again. A text
// piece is cut where the caller's room ends; the rest follows as further pieces of the
// same item. Hidden text is reported without being written: inside a type-2/type-3
// span, or as a single piece marked not taken.
#include <algorithm>
#include <cstring>
#include <functional>
#include <mutex>
#include <new>
#include <utility>

#include "model.h"

using antk::Fn;
using antk::detail::failing;
using antk::detail::ItemRec;
using antk::detail::kErrBadArgument;
using antk::detail::kErrNoMemory;
using antk::detail::kErrNoRoom;
using antk::detail::kErrNotFound;
using antk::detail::kNoText;
using antk::detail::kNotTakenFlag;

namespace {

constexpr uint32_t kReadNothing = 0;
constexpr uint32_t kReadOtherItem = 4;

uint32_t bytesPerChar(uint32_t charSet) { return charSet == antk::kCharSetWide ? 2 : 1; }

void report(CAReadRecord *rec, const CAContent &ca, uint32_t type, uint32_t flags,
            uint32_t itemIndex, uint32_t chars, uint32_t written) {
    rec->type = type;
    rec->flags = flags;
    rec->charCount = chars;
    rec->charSet = ca.charSet;
    rec->itemIndex = static_cast<uint16_t>(itemIndex);
    rec->written = written;
}

void writeUnits(const CAContent &ca, const char16_t *units, uint32_t count, void *buffer) {
    auto *out = static_cast<unsigned char *>(buffer);
    if (ca.charSet == antk::kCharSetWide) {
        for (uint32_t i = 0; i < count; ++i, out += 2) {
            out[0] = static_cast<unsigned char>(units[i] & 0xFF);
            out[1] = static_cast<unsigned char>(units[i] >> 8);
        }
    } else {
        for (uint32_t i = 0; i < count; ++i) {
            out[i] = units[i] < 0x100 ? static_cast<unsigned char>(units[i]) : '?';
        }
    }
}

void moveToNextItem(CAContent &ca) {
    ++ca.item;
    ca.offset = 0;
    ca.phase = 0;
}

uint32_t readNext(CAContent &ca, CAReadRecord *rec) {
    const auto &chunks = ca.model->chunks;
    if (ca.atEnd || ca.chunk >= chunks.size() || ca.item >= chunks[ca.chunk].items.size()) {
        ca.atEnd = true;
        report(rec, ca, ANMOD_READ_END, 0, 0, 0, 0);
        return 0;
    }
    const ItemRec &item = chunks[ca.chunk].items[ca.item];
    const uint32_t index = ca.item;
    if (item.text == kNoText || item.field3 == 0) {
        moveToNextItem(ca);
        report(rec, ca, kReadOtherItem, 0, index, 0, 0);
        return 0;
    }
    const uint32_t count = item.field3;
    if (item.hidden) {
        if (item.spanFlags == 0) {
            moveToNextItem(ca);
            report(rec, ca, ANMOD_READ_TEXT, kNotTakenFlag, index, count, 0);
        } else if (ca.phase == 0) {
            ca.phase = 1;
            report(rec, ca, ANMOD_READ_SPAN_START, item.spanFlags, index, 0, 0);
        } else if (ca.phase == 1) {
            ca.phase = 2;
            report(rec, ca, ANMOD_READ_TEXT, 0, index, count, 0);
        } else {
            moveToNextItem(ca);
            report(rec, ca, ANMOD_READ_SPAN_END, item.spanFlags, index, 0, 0);
        }
        return 0;
    }
    const uint32_t left = count - ca.offset;
    const uint32_t fit =
        rec->buffer == nullptr ? 0 : std::min(left, rec->room / bytesPerChar(ca.charSet));
    if (fit == 0) {
        return kErrNoRoom;
    }
    const std::u16string &text = ca.model->texts[item.text];
    writeUnits(ca, text.data() + ca.offset, fit, rec->buffer);
    ca.offset += fit;
    if (ca.offset == count) {
        moveToNextItem(ca);
    }
    report(rec, ca, ANMOD_READ_TEXT, 0, index, fit, fit * bytesPerChar(ca.charSet));
    return 0;
}

struct ReadHook {
    std::mutex mutex;
    std::function<void(CAReadRecord *)> fn;
};

ReadHook &readHook() {
    static ReadHook hook;
    return hook;
}

void runReadHook(CAReadRecord *rec) {
    std::function<void(CAReadRecord *)> fn;
    {
        std::lock_guard<std::mutex> guard(readHook().mutex);
        fn = readHook().fn;
    }
    if (fn) {
        fn(rec);
    }
}

bool validRecord(const CAReadRecord *rec) {
    return rec != nullptr && rec->size == sizeof(CAReadRecord);
}

}  // namespace

extern "C" {

uint32_t CAOpenContent(DAHandle doc, CAHandle *content) {
    uint32_t code;
    if (failing(Fn::CAOpenContent, code)) {
        return code;
    }
    if (doc == nullptr || content == nullptr) {
        return kErrBadArgument;
    }
    CAContent *ca = new (std::nothrow) CAContent;
    if (ca == nullptr) {
        return kErrNoMemory;
    }
    ca->model = doc->model;
    ca->charSet = doc->charSet.load();
    antk::detail::openContentCount.fetch_add(1);
    *content = ca;
    return 0;
}

// Goes back to the start of the document. Without a buffer or room it reports
// nothing (type 0); otherwise it reads the first piece as CAReadNext does.
uint32_t CAReadFirst(CAHandle content, CAReadRecord *read) {
    uint32_t code;
    if (failing(Fn::CAReadFirst, code)) {
        return code;
    }
    if (content == nullptr || !validRecord(read)) {
        return kErrBadArgument;
    }
    content->chunk = 0;
    content->item = 0;
    content->offset = 0;
    content->phase = 0;
    content->atEnd = false;
    if (read->buffer == nullptr || read->room == 0) {
        report(read, *content, kReadNothing, 0, 0, 0, 0);
        return 0;
    }
    return readNext(*content, read);
}

uint32_t CAReadNext(CAHandle content, CAReadRecord *read) {
    uint32_t code;
    if (failing(Fn::CAReadNext, code)) {
        return code;
    }
    if (content == nullptr || !validRecord(read)) {
        return kErrBadArgument;
    }
    const uint32_t rc = readNext(*content, read);
    if (rc == 0) {
        runReadHook(read);
    }
    return rc;
}

// position[0] is an item id: reading starts at that item and ends with its chunk.
// The other three values are not used.
uint32_t CASeek(CAHandle content, const uint32_t *position) {
    uint32_t code;
    if (failing(Fn::CASeek, code)) {
        return code;
    }
    if (content == nullptr || position == nullptr) {
        return kErrBadArgument;
    }
    if (content->model->findItem(position[0]) == nullptr) {
        return kErrNotFound;
    }
    content->chunk = antk::detail::chunkOf(position[0]);
    content->item = antk::detail::indexOf(position[0]);
    content->offset = 0;
    content->phase = 0;
    content->atEnd = false;
    return 0;
}

// An injected failure still closes the content, so that failure sweeps leak nothing.
uint32_t CACloseContent(CAHandle content) {
    uint32_t code;
    const bool failed = failing(Fn::CACloseContent, code);
    if (content == nullptr) {
        return failed ? code : kErrBadArgument;
    }
    delete content;
    antk::detail::openContentCount.fetch_sub(1);
    return failed ? code : 0;
}

}  // extern "C"

namespace antk {

void setContentReadHook(std::function<void(CAReadRecord *)> hook) {
    std::lock_guard<std::mutex> guard(readHook().mutex);
    readHook().fn = std::move(hook);
}

void detail::clearContentReadHook() { setContentReadHook(nullptr); }

}  // namespace antk
