// The document builder, and the toolkit calls that look at or destroy a document.
#include <algorithm>
#include <stdexcept>

#include "model.h"

namespace antk {

using detail::ChunkRec;
using detail::ItemRec;
using detail::kMaxChunkChars;
using detail::kMaxChunkItems;
using detail::kMaxChunks;
using detail::kNoText;
using detail::makeId;
using detail::Model;

void detail::Model::finish() {
    uint32_t chars = 0;
    uint32_t items = 0;
    for (ChunkRec &c : chunks) {
        c.firstChar = chars;
        c.firstItem = items;
        chars += c.charCount;
        items += static_cast<uint32_t>(c.items.size());
    }
    totalChars = chars;
    totalItems = items;
}

struct DocumentBuilder::Impl {
    std::shared_ptr<Model> model = std::make_shared<Model>();
    uint32_t maxItems;
    bool chunkOpen = false;
    uint32_t sectionStart = 0;  // first chunk of the section being built
    bool built = false;

    explicit Impl(uint32_t maxItemsPerChunk)
        : maxItems(std::clamp<uint32_t>(maxItemsPerChunk, 1, kMaxChunkItems)) {}

    void mutating() const {
        if (built) {
            throw std::logic_error("antk::DocumentBuilder: the document was already built");
        }
    }

    void closeChunk() { chunkOpen = false; }

    void closeSection() {
        closeChunk();
        const auto count = static_cast<uint32_t>(model->chunks.size());
        if (count > sectionStart) {
            model->sections.push_back({sectionStart, count - 1});
            sectionStart = count;
        }
    }

    // Appends an item with `chars` characters, opening a new chunk when the current one
    // has no room for it; returns the item's id.
    uint32_t add(const ItemRec &rec, uint32_t chars) {
        mutating();
        if (chars > kMaxChunkChars) {
            throw std::length_error("antk::DocumentBuilder: a text item holds at most 65536 units");
        }
        if (chunkOpen) {
            const ChunkRec &c = model->chunks.back();
            if (c.items.size() >= maxItems || c.charCount + chars > kMaxChunkChars) {
                closeChunk();
            }
        }
        if (!chunkOpen) {
            if (model->chunks.size() >= kMaxChunks) {
                throw std::length_error("antk::DocumentBuilder: too many chunks");
            }
            model->chunks.emplace_back();
            chunkOpen = true;
        }
        ChunkRec &c = model->chunks.back();
        const auto chunk = static_cast<uint32_t>(model->chunks.size() - 1);
        const uint32_t id = makeId(chunk, static_cast<uint32_t>(c.items.size()));
        c.items.push_back(rec);
        if (rec.text != kNoText) {
            c.items.back().field2 = makeId(chunk, c.charCount);
            c.items.back().field3 = chars;
            c.charCount += chars;
        }
        return id;
    }

    ItemRec *findMutable(uint32_t id) {
        const uint32_t c = detail::chunkOf(id);
        if (c >= model->chunks.size() || detail::indexOf(id) >= model->chunks[c].items.size()) {
            return nullptr;
        }
        return &model->chunks[c].items[detail::indexOf(id)];
    }
};

DocumentBuilder::DocumentBuilder(uint32_t maxItemsPerChunk) : impl_(new Impl(maxItemsPerChunk)) {}

DocumentBuilder::~DocumentBuilder() { delete impl_; }

uint32_t DocumentBuilder::item(uint32_t type, uint32_t field2, uint32_t field3) {
    ItemRec rec;
    rec.type = type;
    rec.field2 = field2;
    rec.field3 = field3;
    return impl_->add(rec, 0);
}

uint32_t DocumentBuilder::textItem(std::u16string_view units) {
    impl_->mutating();
    if (units.size() > kMaxChunkChars) {
        throw std::length_error("antk::DocumentBuilder: a text item holds at most 65536 units");
    }
    Model &m = *impl_->model;
    m.texts.emplace_back(units);
    ItemRec rec;
    rec.type = kItemText;
    rec.text = static_cast<uint32_t>(m.texts.size() - 1);
    try {
        return impl_->add(rec, static_cast<uint32_t>(units.size()));
    } catch (...) {
        m.texts.pop_back();
        throw;
    }
}

uint32_t DocumentBuilder::textItem(std::string_view ascii) {
    std::u16string units;
    units.reserve(ascii.size());
    for (const char ch : ascii) {
        units.push_back(static_cast<char16_t>(static_cast<unsigned char>(ch)));
    }
    return textItem(std::u16string_view(units));
}

uint32_t DocumentBuilder::cutItem() { return item(ANMOD_ITEM_CUT_TYPE, ANMOD_ITEM_CUT_FIELD); }

uint32_t DocumentBuilder::skippedItem(uint32_t type) { return item(type); }

void DocumentBuilder::newChunk() {
    impl_->mutating();
    impl_->closeChunk();
}

void DocumentBuilder::newSection() {
    impl_->mutating();
    impl_->closeSection();
}

void DocumentBuilder::range(uint32_t firstItem, uint32_t code) {
    impl_->mutating();
    impl_->model->ranges.push_back({firstItem, code});
}

void DocumentBuilder::hideItemText(uint32_t itemId, uint32_t spanFlags) {
    impl_->mutating();
    ItemRec *rec = impl_->findMutable(itemId);
    if (rec == nullptr || rec->text == kNoText) {
        throw std::invalid_argument("antk::DocumentBuilder::hideItemText: not a text item");
    }
    rec->hidden = true;
    rec->spanFlags = spanFlags;
}

void DocumentBuilder::option(uint32_t value) {
    impl_->mutating();
    impl_->model->option = value;
}

void DocumentBuilder::noChunker() {
    impl_->mutating();
    impl_->model->hasChunker = false;
}

std::vector<uint32_t> DocumentBuilder::charIds(uint32_t itemId) const {
    std::vector<uint32_t> ids;
    const ItemRec *rec = impl_->model->findItem(itemId);
    if (rec != nullptr && rec->text != kNoText) {
        for (uint32_t i = 0; i < rec->field3; ++i) {
            ids.push_back(rec->field2 + i);
        }
    }
    return ids;
}

// A second build() makes another document over the same content.
DAHandle DocumentBuilder::build() {
    if (!impl_->built) {
        impl_->closeSection();
        impl_->model->finish();
        impl_->built = true;
    }
    auto *doc = new DADocument;
    doc->model = impl_->model;
    doc->retrieved.doc = doc;
    return doc;
}

void destroyDocument(DAHandle doc) {
    if (doc == nullptr) {
        return;
    }
    if (doc->secondary) {
        detail::openSecondaryCount.fetch_sub(1);
    }
    delete doc;
}

std::vector<ItemView> items(DAHandle doc) {
    std::vector<ItemView> out;
    if (doc == nullptr) {
        return out;
    }
    const Model &m = *doc->model;
    out.reserve(m.totalItems);
    for (uint32_t c = 0; c < m.chunks.size(); ++c) {
        const auto &list = m.chunks[c].items;
        for (uint32_t k = 0; k < list.size(); ++k) {
            const ItemRec &rec = list[k];
            const bool text = rec.text != kNoText;
            out.push_back({makeId(c, k), rec.type, text ? rec.field2 : 0, text ? rec.field3 : 0});
        }
    }
    return out;
}

std::u16string itemText(DAHandle doc, uint32_t itemId) {
    if (doc == nullptr) {
        return {};
    }
    const ItemRec *rec = doc->model->findItem(itemId);
    if (rec == nullptr || rec->text == kNoText) {
        return {};
    }
    return doc->model->texts[rec->text];
}

void *annoSlot(DAHandle doc) {
    return doc == nullptr ? nullptr : doc->retrieved.slots[ANMOD_SLOT_ANNO];
}

bool moduleDataDestroyed(DAHandle doc) { return doc != nullptr && doc->retrieved.destroyed.load(); }

}  // namespace antk
