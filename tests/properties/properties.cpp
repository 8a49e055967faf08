// Property runs and failure sweeps over the fuzz target's decoder: each input is a pair of
// documents and calls over every export, checked after every operation against the
// brute-force readings and the table's rules, leak-free at the end. Inputs come from the
// seed corpus or a fixed pseudo-random sequence, so every run repeats; a broken expectation
// aborts with the operations that led to it.
//   anno_properties replay PATH...                  files, and the files of directories
//   anno_properties random SEED COUNT [FILL]        generated inputs, FILL entries first
//   anno_properties sweep allocations|calls SEED COUNT [FILL]
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "anno/toolkit.h"
#include "fuzz_support.h"
#if !defined(_WIN32)
#include "anno/winapi_test.h"
#endif

namespace {

constexpr uint32_t kModuleCode = 0x4D00;  // no code of the library's own

#if !defined(_WIN32)
constexpr bool kHeapControls = true;
void ResetAllocations() { anwin::resetCounters(); }
uint64_t Allocations() { return anwin::allocations(); }
void FailAllocation(uint64_t n, bool sticky) { anwin::failAllocation(n, sticky); }
#else
constexpr bool kHeapControls = false;  // the system heap has no failure injection
void ResetAllocations() {}
uint64_t Allocations() { return 0; }
void FailAllocation(uint64_t, bool) {}
#endif

uint64_t Next(uint64_t &state) {  // splitmix64
    uint64_t z = (state += 0x9E3779B97F4A7C15ull);
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
    return z ^ (z >> 31);
}

void Run(const std::vector<uint8_t> &input) { annofuzz::RunInput(input.data(), input.size()); }

void Replay(const std::filesystem::path &path) {
    std::ifstream in(path, std::ios::binary);
    Run(std::vector<uint8_t>(std::istreambuf_iterator<char>(in), {}));
}

// Runs `input` once to count the failure points of its operations, then once with each
// failing alone and once with each failing from then on. Every operation counts as one a
// failure may hit: answers are not held to the readings, but the rules hold after every
// operation, notifications match what was added or removed, and nothing is left behind.
uint64_t Sweep(const std::vector<uint8_t> &input, bool allocations) {
    if (allocations && !kHeapControls) return 0;
    uint64_t total = 0;
    annofuzz::settings.sweep = true;
    annofuzz::settings.arm = [] { ResetAllocations(), antk::resetCalls(); };
    annofuzz::settings.disarm = [&] { total = allocations ? Allocations() : antk::totalCalls(); };
    Run(input);
    annofuzz::settings.disarm = nullptr;
    for (uint64_t n = 1, points = total; n <= points; ++n) {
        for (const bool sticky : {false, true}) {
            annofuzz::settings.arm = [=] {
                allocations ? FailAllocation(n, sticky) : antk::failAnyCall(n, kModuleCode, sticky);
            };
            Run(input);
        }
    }
    annofuzz::settings = annofuzz::Settings{};
    return total;
}

}  // namespace

int main(int argc, char **argv) {
    const std::string mode = argc > 1 ? argv[1] : "";
    const int at = mode == "sweep" ? 3 : 2;  // where SEED is
    if (mode == "replay") {
        for (int i = 2; i < argc; ++i) {
            if (!std::filesystem::is_directory(argv[i])) Replay(argv[i]);
            if (std::filesystem::is_directory(argv[i]))
                for (const auto &file : std::filesystem::directory_iterator(argv[i])) Replay(file);
        }
    } else if ((mode == "random" || mode == "sweep") && argc > at + 1) {
        uint64_t state = std::strtoull(argv[at], nullptr, 10), points = 0;
        for (uint64_t i = std::strtoull(argv[at + 1], nullptr, 10); i > 0; --i) {
            std::vector<uint8_t> input(64 + Next(state) % 960);
            for (uint8_t &b : input) b = static_cast<uint8_t>(Next(state));
            annofuzz::settings.fillers = argc > at + 2 ? std::atoi(argv[at + 2]) : 0;
            if (mode == "random") Run(input);
            if (mode == "sweep") points += Sweep(input, std::string(argv[2]) == "allocations");
        }
        std::printf("%llu failure points swept\n", static_cast<unsigned long long>(points));
    } else {
        std::fprintf(stderr, "usage: see the head of tests/properties/properties.cpp\n");
        return 2;
    }
    std::printf("%llu library calls\n", static_cast<unsigned long long>(annofuzz::apiCalls));
    return 0;
}
