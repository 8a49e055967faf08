// Property runs and failure sweeps over the fuzz target's decoder: each input is a
// document pair and a sequence of calls over every export, checked after every
// operation against the brute-force readings and the table's rules, leak-free at the
// end. The inputs come from the seed corpus or from a fixed pseudo-random sequence, so
// every run is repeatable; a broken expectation aborts with the operations that led
// to it.
//
//   anno_properties replay PATH...          the files given, and every file of the
//                                           directories given (the seed corpus)
//   anno_properties random SEED COUNT [FILL] COUNT generated inputs; FILL entries first
//   anno_properties sweep KIND SEED COUNT [FILL]  failure sweeps over COUNT generated
//                                           inputs: KIND allocations or calls (module calls)
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

// The code every injected module failure carries, none of the library's own.
constexpr uint32_t kModuleCode = 0x4D00;

uint64_t Next(uint64_t &state) {  // splitmix64
    uint64_t z = (state += 0x9E3779B97F4A7C15ull);
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
    return z ^ (z >> 31);
}

std::vector<uint8_t> Generated(uint64_t &state) {
    std::vector<uint8_t> input(64 + Next(state) % 960);
    for (uint8_t &b : input) b = static_cast<uint8_t>(Next(state));
    return input;
}

void Run(const std::vector<uint8_t> &input) { annofuzz::RunInput(input.data(), input.size()); }

int Replay(int argc, char **argv) {
    size_t files = 0;
    auto replay = [&](const std::filesystem::path &path) {
        std::ifstream in(path, std::ios::binary);
        Run(std::vector<uint8_t>(std::istreambuf_iterator<char>(in), {}));
        ++files;
    };
    for (int i = 2; i < argc; ++i) {
        if (!std::filesystem::is_directory(argv[i])) {
            replay(argv[i]);
            continue;
        }
        for (const auto &file : std::filesystem::directory_iterator(argv[i])) replay(file.path());
    }
    std::printf("%zu inputs replayed\n", files);
    return files > 0 ? 0 : 1;
}

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

// Runs `input` once to count the failure points of its operations, then once with
// each failing alone and once with each failing from then on. The decoder treats
// every operation as one a failure may hit: results are not held to the readings, but
// the rules hold after every operation, notifications match what was added or
// removed, and nothing is left behind.
uint64_t Sweep(const std::vector<uint8_t> &input, bool allocations) {
    if (allocations && !kHeapControls) return 0;
    uint64_t points = 0;
    annofuzz::settings.sweep = true;
    annofuzz::settings.arm = [] {
        ResetAllocations();
        antk::resetCalls();
    };
    annofuzz::settings.disarm = [&] { points = allocations ? Allocations() : antk::totalCalls(); };
    Run(input);
    const uint64_t total = points;
    annofuzz::settings.disarm = nullptr;
    for (uint64_t n = 1; n <= total; ++n) {
        for (const bool sticky : {false, true}) {
            annofuzz::settings.arm = [=] {
                if (allocations) FailAllocation(n, sticky);
                if (!allocations) antk::failAnyCall(n, kModuleCode, sticky);
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
    if (mode == "replay" && argc > 2) return Replay(argc, argv);
    if ((mode == "random" && argc > 3) || (mode == "sweep" && argc > 4)) {
        const int at = mode == "sweep" ? 3 : 2;
        uint64_t state = std::strtoull(argv[at], nullptr, 10);
        const uint64_t count = std::strtoull(argv[at + 1], nullptr, 10);
        const uint32_t fill = argc > at + 2 ? std::atoi(argv[at + 2]) : 0;
        uint64_t points = 0;
        for (uint64_t i = 0; i < count; ++i) {
            const std::vector<uint8_t> input = Generated(state);
            annofuzz::settings.fillers = fill;
            if (mode == "random") Run(input);
            if (mode == "sweep") points += Sweep(input, std::string(argv[2]) == "allocations");
        }
        std::printf("%llu inputs, %llu failure points swept, %llu library calls\n",
                    static_cast<unsigned long long>(count), static_cast<unsigned long long>(points),
                    static_cast<unsigned long long>(annofuzz::apiCalls));
        return 0;
    }
    std::fprintf(stderr,
                 "usage: anno_properties replay DIR... | random SEED COUNT [FILL] |"
                 " sweep allocations|calls SEED COUNT\n");
    return 2;
}
