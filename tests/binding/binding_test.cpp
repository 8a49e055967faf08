// Making, finding and freeing the annotation state of a document.
#include <gtest/gtest.h>

#include "binding/instance.h"
#include "hosts/heap.h"
#include "store/table.h"
#include "styles/styles.h"
#include "support/fixture.h"

namespace {

using annotest::Doc;
using annotest::PlainDocument;
using antk::Fn;

class BindingTest : public annotest::LeakCheckedTest {};

ANInstance *StateOf(DAHandle doc) { return static_cast<ANInstance *>(antk::annoSlot(doc)); }

TEST_F(BindingTest, InitMakesAFreshStateThatEveryCallFindsUntilDeInit) {
    Doc doc(PlainDocument(3));
    int marker = 0;
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, &marker), AN_OK);
    ANInstance *state = StateOf(doc);
    ASSERT_NE(state, nullptr);
    EXPECT_EQ(state->entries, nullptr);
    ASSERT_NE(state->styles, nullptr);
    EXPECT_EQ(state->styles->count, 0);
    EXPECT_EQ(state->styles->capacity, 0);
    EXPECT_EQ(state->styles->styles, nullptr);
    EXPECT_EQ(state->hoverEntry, AN_NONE);
    EXPECT_EQ(state->hoverPos.itemId, ANPOS_NOSUBITEM);
    EXPECT_EQ(state->hoverPos.subItemId, ANPOS_NOSUBITEM);
    EXPECT_EQ(state->callbackData, &marker);
    EXPECT_EQ(state->mapCache[0].chunk, ANMAP_NO_CHUNK);
    EXPECT_EQ(state->mapCache[1].chunk, ANMAP_NO_CHUNK);
    EXPECT_EQ(state->charSet, antk::kDefaultOSCharSet);

    EXPECT_EQ(ANSetCallback(doc, nullptr, nullptr), AN_OK) << "every call finds the state";

    EXPECT_EQ(ANDeInit(doc), AN_OK);
    EXPECT_EQ(antk::annoSlot(doc), nullptr);
    EXPECT_EQ(ANSetCallback(doc, nullptr, nullptr), AN_ERR_NOSTATE);
    EXPECT_EQ(ANDeInit(doc), AN_OK) << "a document without state de-inits quietly";

    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK) << "init again after de-init";
    EXPECT_NE(StateOf(doc), nullptr);
    EXPECT_EQ(StateOf(doc)->callbackData, nullptr);
}

TEST_F(BindingTest, NullHandlesAreRefusedOrIgnoredAsEachCallSays) {
    EXPECT_EQ(ANInit(nullptr, nullptr, nullptr, nullptr), AN_OK);
    EXPECT_EQ(ANDeInit(nullptr), AN_ERR_BADARG);
    EXPECT_EQ(ANSetCallback(nullptr, nullptr, nullptr), AN_ERR_BADARG);
}

TEST_F(BindingTest, DocumentWithoutChunkerGetsNoState) {
    antk::DocumentBuilder builder;
    builder.item(1);
    builder.noChunker();
    Doc doc(builder.build());
    EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    EXPECT_EQ(antk::annoSlot(doc), nullptr);
    EXPECT_EQ(ANSetCallback(doc, nullptr, nullptr), AN_ERR_NOSTATE);
}

TEST_F(BindingTest, WideContentOptionPicksTheWideCharacterSetWithoutAskingTheSystem) {
    antk::DocumentBuilder builder;
    builder.item(1);
    builder.option(0x10);
    Doc doc(builder.build());
    antk::resetCalls();
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    EXPECT_EQ(StateOf(doc)->charSet, antk::kCharSetWide);
    EXPECT_EQ(antk::calls(Fn::UTGetOSCharSet), 0u);
}

TEST_F(BindingTest, OtherOptionBitsAskTheSystemForItsCharacterSet) {
    antk::DocumentBuilder builder;
    builder.item(1);
    builder.option(0x0F);
    Doc doc(builder.build());
    antk::resetCalls();
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    EXPECT_EQ(StateOf(doc)->charSet, antk::kDefaultOSCharSet);
    EXPECT_EQ(antk::calls(Fn::UTGetOSCharSet), 1u);
}

TEST_F(BindingTest, FailedOptionReadCountsAsZero) {
    antk::DocumentBuilder builder;
    builder.item(1);
    builder.option(0x10);
    Doc doc(builder.build());
    antk::failCall(Fn::DAGetOption, 1, 77);
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    EXPECT_EQ(StateOf(doc)->charSet, antk::kDefaultOSCharSet);
}

TEST_F(BindingTest, ModuleFailuresDuringInitArePassedOnAndLeaveNoState) {
    for (Fn fn : {Fn::DAGetHChunker, Fn::DARetrieveDocHandle}) {
        Doc doc(PlainDocument(1));
        antk::failCall(fn, 1, 42);
        EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), 42u) << antk::fnName(fn);
        antk::clearFailures();
        EXPECT_EQ(antk::annoSlot(doc), nullptr) << antk::fnName(fn);
        EXPECT_FALSE(antk::moduleDataDestroyed(doc));
    }
}

TEST_F(BindingTest, FailedLockDestroysTheModuleDataAndUnlocksOnce) {
    Doc doc(PlainDocument(1));
    antk::resetCalls();
    antk::failCall(Fn::DALockModuleData, 1, 31);
    EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), 31u);
    EXPECT_TRUE(antk::moduleDataDestroyed(doc));
    EXPECT_EQ(antk::calls(Fn::DAUnlockModuleData), 1u);
    EXPECT_EQ(antk::calls(Fn::DADestroyModuleData), 1u);
}

TEST_F(BindingTest, OutOfMemoryForTheStateGives13) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    Doc doc(PlainDocument(1));
    anwin::failAllocation(1);
    EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_ERR_NOMEM);
    anwin::clearFailures();
    EXPECT_EQ(antk::annoSlot(doc), nullptr);
#endif
}

TEST_F(BindingTest, OutOfMemoryForTheStyleTableStillMakesTheState) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    Doc doc(PlainDocument(1));
    anwin::failAllocation(2);
    EXPECT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    anwin::clearFailures();
    ASSERT_NE(StateOf(doc), nullptr);
    EXPECT_EQ(StateOf(doc)->styles, nullptr);
#endif
}

TEST_F(BindingTest, DeInitWithAFailedLockKeepsTheState) {
    Doc doc(PlainDocument(1));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::resetCalls();
    antk::failCall(Fn::DALockModuleData, 1, 55);
    EXPECT_EQ(ANDeInit(doc), 55u);
    EXPECT_EQ(antk::calls(Fn::DAUnlockModuleData), 1u);
    EXPECT_NE(antk::annoSlot(doc), nullptr);
    antk::failCall(Fn::DARetrieveDocHandle, 1, 56);
    EXPECT_EQ(ANDeInit(doc), 56u);
    EXPECT_NE(antk::annoSlot(doc), nullptr);
}

TEST_F(BindingTest, LookupPassesOnDataAccessFailures) {
    Doc doc(PlainDocument(1));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    antk::failCall(Fn::DAGetAnno, 1, 61);
    EXPECT_EQ(ANSetCallback(doc, nullptr, nullptr), 61u);
}

uint32_t SomeCallback(uint16_t, uint16_t, void *, void *) { return 7; }

TEST_F(BindingTest, SetCallbackReplacesTheCallbackAndItsValue) {
    Doc doc(PlainDocument(1));
    int first = 0;
    int second = 0;
    ASSERT_EQ(ANInit(doc, nullptr, SomeCallback, &first), AN_OK);
    ANInstance *state = StateOf(doc);
    EXPECT_EQ(state->callback, &SomeCallback);
    ASSERT_EQ(ANSetCallback(doc, nullptr, &second), AN_OK);
    EXPECT_EQ(state->callback, nullptr);
    EXPECT_EQ(state->callbackData, &second);
    EXPECT_EQ(StateOf(doc), state) << "the state itself is kept";
}

// ANDeInit frees what the state owns however it came to own it: entries with their
// texts, styles, character maps and the content document.
TEST_F(BindingTest, DeInitReleasesEverythingTheStateOwnsButNotUserData) {
    Doc doc(PlainDocument(2));
    ASSERT_EQ(ANInit(doc, nullptr, nullptr, nullptr), AN_OK);
    ANInstance *state = StateOf(doc);

    // A table of two entries: a text entry with its buffer, and a highlight whose
    // userData is a caller block that de-init must leave alone.
    auto *table = static_cast<ANEntryTable *>(ANHeapAlloc(ANTableBytes(10), true));
    ASSERT_NE(table, nullptr);
    table->count = 2;
    table->capacity = 10;
    table->first = 0;
    table->last = 1;
    ANSlot(table, 0) = ANEntry{AN_NONE, AN_NONE, AN_TYPE_TEXT, 0, {}};
    ANSlot(table, 0).next = 1;
    ANSlot(table, 0).record.textBuffer = static_cast<uint16_t *>(ANHeapAlloc(128));
    ANSlot(table, 1) = ANEntry{AN_NONE, 0, AN_TYPE_HILITE, 0, {}};
    void *userBlock = ANHeapAlloc(16);
    ANSlot(table, 1).record.userData = reinterpret_cast<uintptr_t>(userBlock);
    state->entries = table;

    ANHiliteStyle style{};
    state->styles->styles = static_cast<ANHiliteStyle *>(ANHeapAlloc(sizeof style * 10));
    state->styles->capacity = 10;
    state->mapCache[0].block = GlobalAlloc(GMEM_MOVEABLE, 64);
    state->mapCache[0].chunk = 0;
    state->mapCache[1].block = GlobalAlloc(GMEM_MOVEABLE, 64);
    state->mapCache[1].chunk = 1;
    CHHandle chunker = state->chunker;
    ASSERT_EQ(DAOpenDocument(&state->contentDoc, 18, &chunker, 0), 0u);
    ASSERT_EQ(CAOpenContent(state->contentDoc, &state->content), 0u);

    EXPECT_EQ(ANDeInit(doc), AN_OK);
    EXPECT_EQ(antk::openSecondaryDocuments(), 0);
    EXPECT_EQ(antk::openContents(), 0);
    ANHeapFree(userBlock);  // the caller's, still valid after de-init
}

TEST_F(BindingTest, LibraryEntrySwitchedOffThreadNotificationsOnce) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    EXPECT_EQ(anwin::threadLibraryCallsDisabled(), 1);
#endif
}

}  // namespace
