#include "hostile/hostile_support.h"

#include <cstdio>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "store/table.h"
#include "styles/styles.h"

namespace hostile {

namespace {

uint64_t gTried = 0;

class InputsPrinter : public ::testing::Environment {
 public:
    void TearDown() override {
        if (gTried != 0) {
            std::printf("[ hostile ] %llu hostile inputs tried\n",
                        static_cast<unsigned long long>(gTried));
        }
    }
};

[[maybe_unused]] ::testing::Environment *const kInputsPrinter =
    ::testing::AddGlobalTestEnvironment(new InputsPrinter);

bool SameListed(const annotest::Listed &a, const annotest::Listed &b) {
    return a.slot == b.slot && a.type == b.type && a.flags == b.flags && a.text == b.text &&
           std::memcmp(&a.record, &b.record, sizeof a.record) == 0;
}

bool SameStyles(const std::vector<ANHiliteStyle> &a, const std::vector<ANHiliteStyle> &b) {
    return a.size() == b.size() &&
           (a.empty() || std::memcmp(a.data(), b.data(), a.size() * sizeof a[0]) == 0);
}

}  // namespace

uint32_t Tried(uint32_t rc) {
    ++gTried;
    return rc;
}

uint64_t InputsTried() { return gTried; }

std::vector<ANHiliteStyle> StylesOf(const ANStyleTable *table) {
    if (table == nullptr || table->styles == nullptr) return {};
    return std::vector<ANHiliteStyle>(table->styles, table->styles + table->count);
}

Snapshot Snapshot::Of(DAHandle doc) {
    Snapshot s;
    const auto *instance =
        doc == nullptr ? nullptr : static_cast<const ANInstance *>(antk::annoSlot(doc));
    if (instance == nullptr) return s;
    s.hasState = true;
    s.entries = annotest::ListedEntries(doc);
    if (instance->entries != nullptr) {
        const auto *bytes = reinterpret_cast<const uint8_t *>(instance->entries);
        s.header.assign(bytes, bytes + sizeof(ANEntryTable));
    }
    s.hoverEntry = instance->hoverEntry;
    s.hoverPos = instance->hoverPos;
    s.buildCursor = instance->buildCursor;
    s.callback = instance->callback;
    s.callbackData = instance->callbackData;
    s.styles = StylesOf(instance->styles);
    s.globalStyles = StylesOf(instance->globalStyles);
    return s;
}

bool operator==(const Snapshot &a, const Snapshot &b) {
    if (a.hasState != b.hasState || a.header != b.header || a.entries.size() != b.entries.size()) {
        return false;
    }
    for (size_t i = 0; i < a.entries.size(); ++i) {
        if (!SameListed(a.entries[i], b.entries[i])) return false;
    }
    return a.hoverEntry == b.hoverEntry &&
           std::memcmp(&a.hoverPos, &b.hoverPos, sizeof a.hoverPos) == 0 &&
           a.buildCursor == b.buildCursor && a.callback == b.callback &&
           a.callbackData == b.callbackData && SameStyles(a.styles, b.styles) &&
           SameStyles(a.globalStyles, b.globalStyles);
}

const std::vector<uint32_t> &Kinds() {
    static const std::vector<uint32_t> kinds = {0, 1, 2, 3, 4, 5, 6, 0xFFFFFFFF};
    return kinds;
}

std::vector<ANPos> HostilePositions() {
    const uint32_t items[] = {
        0,       3,          kTextAnchorItem, kTextItem, kLastItem, kLastItem + 1,
        0x10000, 0x7FFFFFFF, 0xFFFFFFFE,      0xFFFFFFFF};
    const uint32_t subs[] = {ANPOS_NOSUBITEM, 0, 2, 6, 7, 0xFFFFFFFE};
    const uint32_t indices[] = {0, 1, 3, 0xFFFFFFFF};
    std::vector<ANPos> out;
    for (uint32_t item : items) {
        for (uint32_t sub : subs) {
            for (uint32_t kind : Kinds()) {
                for (uint32_t index : indices) out.push_back(ANPos{item, sub, kind, index});
            }
        }
    }
    return out;
}

std::vector<ANPos> FewHostilePositions() {
    const uint32_t items[] = {3, kTextAnchorItem, kTextItem, kLastItem + 1, 0xFFFFFFFF};
    const uint32_t subs[] = {ANPOS_NOSUBITEM, 2};
    const uint32_t indices[] = {1, 0xFFFFFFFF};
    std::vector<ANPos> out;
    for (uint32_t item : items) {
        for (uint32_t sub : subs) {
            for (uint32_t kind : Kinds()) {
                for (uint32_t index : indices) out.push_back(ANPos{item, sub, kind, index});
            }
        }
    }
    return out;
}

SizedRecord::SizedRecord(uint32_t size, const void *model, size_t modelBytes) {
    const size_t bytes = size < sizeof(uint32_t) ? sizeof(uint32_t) : size;
    bytes_ = std::make_unique<uint8_t[]>(bytes);
    std::memset(bytes_.get(), 0, bytes);
    std::memcpy(bytes_.get(), model, bytes < modelBytes ? bytes : modelBytes);
    std::memcpy(bytes_.get(), &size, sizeof size);
    original_.assign(bytes_.get(), bytes_.get() + bytes);
}

bool SizedRecord::unchanged() const {
    return std::memcmp(bytes_.get(), original_.data(), original_.size()) == 0;
}

DAHandle HostileDocument() {
    antk::DocumentBuilder builder;
    for (uint32_t i = 0; i < kTextItem; ++i) builder.item(antk::kItemParagraph);
    builder.textItem("hostile");
    builder.cutItem();
    builder.skippedItem();
    for (uint32_t i = 13; i <= kLastItem; ++i) builder.item(antk::kItemParagraph);
    return builder.build();
}

void HostileTest::Annotate(DAHandle doc) {
    using annotest::Pos;
    using annotest::TextPos;
    ASSERT_EQ(annotest::AddHilite(doc, Pos(1), Pos(4), 1, ANSTYLEWORD_NUMBER | 7, 0, 0xFF), AN_OK);
    ASSERT_EQ(annotest::AddPoint(doc, Pos(2), 2, 22, AN_TYPE_POINT, 0xFF), AN_OK);
    ASSERT_EQ(annotest::AddPoint(doc, Pos(3), 3, 33, AN_TYPE_VALUE, 0xFF), AN_OK);
    ASSERT_EQ(annotest::AddRange(doc, Pos(5), Pos(8), 4), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(kTextAnchorItem), u"ab", 5), AN_OK);
    ASSERT_EQ(annotest::AddPlaceholder(doc, Pos(kTextAnchorItem), 6), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(kTextAnchorItem), u"cd", 7), AN_OK);
    ASSERT_EQ(annotest::AddCutMark(doc, Pos(9), 8), AN_OK);
    ASSERT_EQ(annotest::AddText(doc, Pos(kTextItem, 2), u"zz", 0x80000009), AN_OK);
    ASSERT_EQ(annotest::AddHilite(doc, TextPos(kTextAnchorItem, ANPOS_NOSUBITEM, 1),
                                  Pos(kTextItem, 4), 10, 0x4C),
              AN_OK);
}

void HostileTest::SetUp() {
    annotest::LeakCheckedTest::SetUp();
    ASSERT_EQ(ANInitGlobalHiliteStyles(&global_), AN_OK);
    ANHiliteStyle style{ANHILITESTYLE_SIZE, 7, ANSTYLE_COLOR1, 0x112233, 0x445566, 1, 2, 0};
    ASSERT_EQ(ANAddGlobalHiliteStyle(global_, &style), AN_OK);
    style.styleId = 8;
    ASSERT_EQ(ANAddGlobalHiliteStyle(global_, &style), AN_OK);

    doc_ = HostileDocument();
    bare_ = HostileDocument();
    antk::DocumentBuilder builder;
    builder.item(antk::kItemParagraph);
    builder.noChunker();
    noChunker_ = builder.build();

    ASSERT_EQ(ANInit(doc_, global_, &annotest::Notifications::Callback, &notes_), AN_OK);
    style.styleId = 7;
    style.color1 = 0x778899;
    ASSERT_EQ(ANAddHiliteStyle(doc_, &style), AN_OK);
    Annotate(doc_);
    ASSERT_TRUE(annotest::TableInvariantsHold(doc_));
    notes_.calls.clear();
}

void HostileTest::TearDown() {
    for (DAHandle *doc : {&doc_, &bare_, &noChunker_}) {
        if (*doc == nullptr) continue;
        EXPECT_TRUE(annotest::TableInvariantsHold(*doc));
        antk::clearFailures();
        EXPECT_EQ(ANDeInit(*doc), AN_OK);
        antk::destroyDocument(*doc);
        *doc = nullptr;
    }
    if (global_ != nullptr) {
        EXPECT_EQ(ANDeInitGlobalHiliteStyles(global_), AN_OK);
    }
    global_ = nullptr;
    RecordProperty("hostileInputs", static_cast<int>(InputsTried()));
    annotest::LeakCheckedTest::TearDown();
}

}  // namespace hostile
