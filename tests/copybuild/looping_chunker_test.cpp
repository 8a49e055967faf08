// Building against a chunker that hands back next ids going round in circles: the
// search for a range's end item must end all the same. The chunker's CHGetItem is
// wrapped here (the test program's definition takes precedence over the toolkit's
// for the library); outside these tests it passes every call through.
#include <gtest/gtest.h>

#if defined(__linux__)
#include <dlfcn.h>
#endif

#include <cstdint>

#include "copybuild/entries.h"
#include "hosts/modules.h"
#include "support/fixture.h"

#if defined(__linux__)
namespace {

using annotest::Doc;

// How the wrapped chunker answers item reads while a test of this file runs.
enum class Loop { Off, SameId, BackToFirst };
Loop gLoop = Loop::Off;
uint32_t gLoopFirst = 0;
uint64_t gLoopReads = 0;
constexpr uint64_t kGiveUp = 10000;  // breaks an endless walk so the test can fail

}  // namespace

extern "C" uint32_t CHGetItem(CHHandle ch, uint32_t idClass, uint32_t id, CHItemInfo *info,
                              uint32_t *nextId) {
    using Fn = uint32_t (*)(CHHandle, uint32_t, uint32_t, CHItemInfo *, uint32_t *);
    static const Fn real = reinterpret_cast<Fn>(dlsym(RTLD_NEXT, "CHGetItem"));
    if (gLoop == Loop::Off || idClass != ANMOD_CLASS_ITEM || nextId == nullptr) {
        return real(ch, idClass, id, info, nextId);
    }
    if (++gLoopReads > kGiveUp) return 1;
    *info = CHItemInfo{};
    info->field1 = antk::kItemParagraph;
    *nextId = gLoop == Loop::SameId ? id : (id > gLoopFirst + 2 ? gLoopFirst : id + 1);
    return 0;
}

namespace {

class LoopingChunkerTest : public annotest::LeakCheckedTest {
 protected:
    void TearDown() override {
        gLoop = Loop::Off;
        annotest::LeakCheckedTest::TearDown();
    }
};

TEST_F(LoopingChunkerTest, EndSearchStopsWhenTheNextIdDoesNotMoveOn) {
    ASSERT_NE(dlsym(RTLD_NEXT, "CHGetItem"), nullptr);
    for (Loop loop : {Loop::SameId, Loop::BackToFirst}) {
        antk::DocumentBuilder b;
        const uint32_t first = b.item(antk::kItemParagraph);
        for (int i = 0; i < 5; ++i) b.item(antk::kItemParagraph);
        b.range(first, 0x81000000);
        Doc doc(b.build());
        ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);

        gLoop = loop;
        gLoopFirst = first;
        gLoopReads = 0;
        EXPECT_EQ(ANBuildAnnos(doc), AN_OK);
        gLoop = Loop::Off;
        EXPECT_LT(gLoopReads, 10u) << "the walk went round";
        EXPECT_EQ(annotest::TableOf(doc), nullptr);
        EXPECT_EQ(copybuild::StateOf(doc)->buildCursor, 1u);
    }
}

}  // namespace
#endif  // __linux__
