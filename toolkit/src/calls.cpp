// Call counters and failure injection for every module function.
//
// Counters since resetCalls() answer calls() and totalCalls(); injection counts on its
// own never-reset counters, so "the n-th call from now" holds whatever resets happen
// in between.
#include <array>
#include <atomic>
#include <cstddef>

#include "model.h"

namespace antk {
namespace {

constexpr std::size_t kFnCount = static_cast<std::size_t>(Fn::Count);

struct Rule {
    std::atomic<uint64_t> target{0};  // call number (on the never-reset counter) to fail; 0 none
    std::atomic<uint32_t> code{0};
    std::atomic<bool> sticky{false};

    void set(uint64_t seenSoFar, uint64_t n, uint32_t c, bool s) {
        target.store(0, std::memory_order_relaxed);
        code.store(c, std::memory_order_relaxed);
        sticky.store(s, std::memory_order_relaxed);
        target.store(n == 0 ? 0 : seenSoFar + n, std::memory_order_release);
    }
    void clear() { target.store(0, std::memory_order_release); }
    bool hits(uint64_t callNumber, uint32_t &out) const {
        const uint64_t t = target.load(std::memory_order_acquire);
        if (t == 0 || callNumber < t) {
            return false;
        }
        if (callNumber != t && !sticky.load(std::memory_order_relaxed)) {
            return false;
        }
        out = code.load(std::memory_order_relaxed);
        return true;
    }
};

struct Counters {
    std::array<std::atomic<uint64_t>, kFnCount> calls{};
    std::array<std::atomic<uint64_t>, kFnCount> seen{};
    std::atomic<uint64_t> seenAll{0};
    std::array<Rule, kFnCount> rules{};
    Rule anyRule;
};

Counters &counters() {
    static Counters c;
    return c;
}

constexpr std::array<const char *, kFnCount> kNames = {
    "DAGetAnno",           "DARetrieveDocHandle", "DALockModuleData", "DAUnlockModuleData",
    "DADestroyModuleData", "DAGetHChunker",       "DAGetOption",      "DAOpenDocument",
    "DASetOption",         "DACloseDocument",     "UTGetOSCharSet",   "CHGetItem",
    "CHNextItemId",        "CHGetItemId",         "CHGetItemCount",   "CHGetItemCountById",
    "CHGetRunFromItemId",  "CHGetRunInfo",        "CHGetSectionInfo", "CAOpenContent",
    "CAReadFirst",         "CAReadNext",          "CASeek",           "CACloseContent",
};

std::size_t slot(Fn fn) { return static_cast<std::size_t>(fn); }

bool valid(Fn fn) { return static_cast<int>(fn) >= 0 && fn < Fn::Count; }

}  // namespace

namespace detail {

std::atomic<int> openSecondaryCount{0};
std::atomic<int> openContentCount{0};

bool failing(Fn fn, uint32_t &code) noexcept {
    Counters &c = counters();
    const std::size_t i = slot(fn);
    c.calls[i].fetch_add(1, std::memory_order_relaxed);
    const uint64_t mine = c.seen[i].fetch_add(1, std::memory_order_relaxed) + 1;
    const uint64_t any = c.seenAll.fetch_add(1, std::memory_order_relaxed) + 1;
    return c.rules[i].hits(mine, code) || c.anyRule.hits(any, code);
}

}  // namespace detail

const char *fnName(Fn fn) { return valid(fn) ? kNames[slot(fn)] : "?"; }

uint64_t calls(Fn fn) {
    return valid(fn) ? counters().calls[slot(fn)].load(std::memory_order_relaxed) : 0;
}

uint64_t totalCalls() {
    uint64_t sum = 0;
    for (const auto &n : counters().calls) {
        sum += n.load(std::memory_order_relaxed);
    }
    return sum;
}

void resetCalls() {
    for (auto &n : counters().calls) {
        n.store(0, std::memory_order_relaxed);
    }
}

void failCall(Fn fn, uint64_t n, uint32_t code, bool sticky) {
    if (!valid(fn)) {
        return;
    }
    Counters &c = counters();
    c.rules[slot(fn)].set(c.seen[slot(fn)].load(std::memory_order_relaxed), n, code, sticky);
}

void failAnyCall(uint64_t n, uint32_t code, bool sticky) {
    Counters &c = counters();
    c.anyRule.set(c.seenAll.load(std::memory_order_relaxed), n, code, sticky);
}

void clearFailures() {
    Counters &c = counters();
    for (auto &r : c.rules) {
        r.clear();
    }
    c.anyRule.clear();
    detail::clearContentReadHook();
}

int openSecondaryDocuments() { return detail::openSecondaryCount.load(); }

int openContents() { return detail::openContentCount.load(); }

}  // namespace antk
