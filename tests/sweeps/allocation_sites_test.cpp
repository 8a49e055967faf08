// The library's allocation sites, listed by hand, each tied to a step of a sweep
// scenario and to what a caller sees when that allocation fails there. The test
// proves that the scenarios reach every site: failing some allocation of the step
// shows the site's mark, which the unfailed run does not show. A second test keeps
// the list complete: it counts the allocation calls in the library's sources.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

#include "anno/toolkit.h"
#include "binding/instance.h"
#include "styles/styles.h"
#include "support/fixture.h"
#include "support/invariants.h"
#include "sweeps/scenarios.h"
#include "sweeps/sweep.h"
#include "tracking/text_track.h"

namespace {

using sweep::World;

// What the world shows after the step when the site's allocation failed.
using Mark = std::function<bool(const World &, uint32_t rc)>;

struct Site {
    const char *file;  // under src/
    const char *what;
    std::function<sweep::Scenario()> scenario;
    std::string step;  // the first step of that name
    Mark mark;
};

const ANInstance *StateOf(const World &w, size_t doc) {
    return static_cast<const ANInstance *>(antk::annoSlot(w.doc(doc)));
}

size_t EntriesWithTag(const World &w, uint32_t tag) {
    size_t n = 0;
    for (const annotest::Listed &e : annotest::ListedEntries(w.doc(0))) n += e.record.tag == tag;
    return n;
}

size_t TextsAt(const World &w, uint32_t item) {
    size_t n = 0;
    for (const annotest::Listed &e : annotest::ListedEntries(w.doc(0))) {
        n += e.type == AN_TYPE_TEXT && e.record.start.itemId == item;
    }
    return n;
}

const ANTextSegList *SegsOf(const World &w) { return w.texts[0].segs; }

// Whether a map that failed for memory stays cached (it must not: a later call tries
// again).
bool MapKept(const World &w) {
    for (const ANCharMap &map : StateOf(w, 0)->mapCache) {
        if (map.chunk != ANMAP_NO_CHUNK) return true;
    }
    return false;
}

std::vector<Site> Sites() {
    using sweep::AnnotationText;
    using sweep::LargeTable;
    using sweep::Mapping;
    using sweep::StylesAndAnnotations;
    return {
        {"binding/binding.cpp", "a document's annotation state", StylesAndAnnotations, "ANInit 0",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM && StateOf(w, 0) == nullptr;
         }},
        {"styles/table.cpp", "a style table (per document; also global)", StylesAndAnnotations,
         "ANInit 0",
         [](const World &w, uint32_t rc) {
             return rc == AN_OK && StateOf(w, 0) != nullptr && StateOf(w, 0)->styles == nullptr;
         }},
        {"styles/table.cpp", "the first style array", StylesAndAnnotations, "ANAddHiliteStyle 101",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM && StateOf(w, 0)->styles->styles == nullptr;
         }},
        {"styles/table.cpp", "a style array growing past 10", StylesAndAnnotations,
         "ANAddHiliteStyle 110",
         [](const World &w, uint32_t rc) {
             const ANStyleTable *t = StateOf(w, 0)->styles;
             ANHiliteStyle kept{};
             return rc == AN_ERR_NOMEM && t->count == 9 && t->capacity == 10 &&
                    ANGetHiliteStyle(w.doc(0), 109, &kept) == 1 && kept.styleId == 109;
         }},
        {"store/slots.cpp", "a new annotation table", StylesAndAnnotations,
         "add highlight 1 (72 bytes)",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM && annotest::TableOf(w.doc(0)) == nullptr;
         }},
        {"store/slots.cpp", "an annotation table growing past 10", StylesAndAnnotations,
         "add range 9 (48 bytes)",
         [](const World &w, uint32_t rc) {
             const ANEntryTable *t = annotest::TableOf(w.doc(0));
             return rc == AN_ERR_NOMEM && t->count == 9 && t->capacity == 10 &&
                    EntriesWithTag(w, 9) == 1;
         }},
        {"store/insert.cpp", "the text buffer of a new text entry (also a split's)",
         StylesAndAnnotations, "add text 16 of 3 at (19, -, 0, 0)",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM && EntriesWithTag(w, 16) == 0;
         }},
        {"store/insert.cpp", "a text buffer growing", AnnotationText,
         "add text 11 of 123 at (3, -, 0, 0)",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM &&
                    annotest::AnchorText(w.doc(0), annotest::Pos(3)) == u"abc";
         }},
        {"store/clear.cpp", "a text buffer growing to join two texts", AnnotationText,
         "ANClearAnnos 8192/66",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM && EntriesWithTag(w, 66) == 0 && TextsAt(w, 3) == 2;
         }},
        {"tracking/text_track.cpp", "a text track's list", AnnotationText, "ANStartAnnoTextTrack 0",
         [](const World &w, uint32_t rc) {
             const ANAnnoTextTrack zero{};
             return rc == AN_ERR_NOMEM && std::memcmp(&w.texts[0], &zero, sizeof zero) == 0;
         }},
        {"tracking/text_track.cpp", "a text track's list growing past 5 segments", AnnotationText,
         "ANGetAnnoText at (5, -, 5, 0)",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM && SegsOf(w)->segCapacity == 5 && SegsOf(w)->segCount == 4;
         }},
        {"tracking/text_track.cpp", "a segment's copy of a text", AnnotationText,
         "ANGetAnnoText at (5, -, 5, 0)",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM &&
                    !(SegsOf(w)->segCapacity == 5 && SegsOf(w)->segCount == 4);
         }},
        {"positions/mapping.cpp", "a character map (global memory)", Mapping,
         "ANMapPosition ordinal 3",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM && w.stepAllocations == 1 && !MapKept(w);
         }},
        {"positions/mapping.cpp", "a map's scratch buffer (global memory)", Mapping,
         "ANMapPosition ordinal 3",
         [](const World &w, uint32_t rc) {
             return rc == AN_ERR_NOMEM && w.stepAllocations == 2 && !MapKept(w);
         }},
        {"store/index.cpp", "the lookup index of a large table", LargeTable,
         "ANNextAnnoTextPos " + ::testing::PrintToString(annotest::Pos(0)),
         [](const World &w, uint32_t rc) {
             // Walked without it: the same answer, and nothing kept.
             return rc == AN_OK && StateOf(w, 0)->index == nullptr;
         }},
    };
}

class AllocationSites : public annotest::LeakCheckedTest {};

TEST_F(AllocationSites, EverySiteIsReachedByASweepScenario) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
#if ANNO_HAVE_PLATFORM_CONTROLS
    size_t reached = 0;
    for (const Site &site : Sites()) {
        SCOPED_TRACE(std::string(site.file) + ": " + site.what);
        const sweep::Scenario scenario = site.scenario();
        const sweep::Reference ref = sweep::RunReference(scenario);
        size_t step = scenario.steps.size();
        for (size_t i = 0; i < scenario.steps.size() && step == scenario.steps.size(); ++i) {
            if (scenario.steps[i].name == site.step) step = i;
        }
        ASSERT_LT(step, scenario.steps.size()) << "no step '" << site.step << "'";

        bool unfailedShowsIt = false;
        sweep::RunAndProbe(scenario, ref, step, [&](const World &w, size_t, uint32_t rc) {
            unfailedShowsIt = site.mark(w, rc);
        });
        EXPECT_FALSE(unfailedShowsIt) << "the unfailed run already shows the mark";

        const uint64_t first = ref.allocationsBefore[step];
        const uint64_t count = ref.allocationsBefore[step + 1] - first;
        bool shown = false;
        for (uint64_t k = 1; k <= count && !shown; ++k) {
            sweep::RunWithFailure(
                scenario, ref, {sweep::Fault::Allocation, first + k, false, ""},
                [&](const World &w, size_t, uint32_t rc) { shown = shown || site.mark(w, rc); });
        }
        EXPECT_TRUE(shown) << "none of the step's " << count << " allocations shows the mark";
        reached += shown ? 1 : 0;
    }
    RecordProperty("sites", static_cast<int>(reached));
    std::printf("[ sweeps  ] %zu of %zu allocation sites reached and failed\n", reached,
                Sites().size());
#endif
}

// Allocation calls by file, read from the library's sources next to this test.
std::map<std::string, size_t> AllocationCallsInSources(const std::filesystem::path &src) {
    const std::regex call(R"(\b(ANHeapAlloc|ANHeapReAlloc|ANHeapNew\s*<[^>]*>|GlobalAlloc)\s*\()");
    std::map<std::string, size_t> calls;
    for (const auto &entry : std::filesystem::recursive_directory_iterator(src)) {
        const std::filesystem::path &path = entry.path();
        if (!entry.is_regular_file() || path.parent_path().filename() == "hosts") continue;
        if (path.extension() != ".cpp" && path.extension() != ".h") continue;
        std::ifstream in(path);
        std::stringstream text;
        text << in.rdbuf();
        const std::string body = text.str();
        const size_t n = static_cast<size_t>(std::distance(
            std::sregex_iterator(body.begin(), body.end(), call), std::sregex_iterator()));
        if (n != 0) calls[std::filesystem::relative(path, src).generic_string()] = n;
    }
    return calls;
}

TEST_F(AllocationSites, TheListNamesEveryAllocationCallOfTheLibrary) {
    ANNO_REQUIRE_PLATFORM_CONTROLS();
    const std::filesystem::path src =
        std::filesystem::path(__FILE__).parent_path().parent_path().parent_path() / "src";
    if (!std::filesystem::is_directory(src)) GTEST_SKIP() << "no sources at " << src;
    std::map<std::string, size_t> listed;
    for (const Site &site : Sites()) listed[site.file]++;
    EXPECT_EQ(AllocationCallsInSources(src), listed)
        << "an allocation call was added or removed: list its site";
}

}  // namespace
