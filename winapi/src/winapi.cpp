// Process heap, movable global memory and the library-entry switch over the C
// runtime, with counters and failure injection for tests.
#include <atomic>
#include <cstdlib>
#include <cstring>

#include "anno/winapi_test.h"
#include "hosts/platform.h"

namespace {

// Every heap block carries its size in front of it, so that a reallocation can zero
// the bytes it adds.
struct alignas(16) BlockHeader {
    size_t bytes;
};

// A global-memory handle: the block and its lock count.
struct GlobalBlock {
    void *data;
    size_t bytes;
    int locks;
};

std::atomic<int64_t> gHeapBlocks{0};
std::atomic<int64_t> gGlobalBlocks{0};
std::atomic<int64_t> gGlobalLocks{0};
std::atomic<uint64_t> gAllocations{0};
std::atomic<int> gThreadCallsDisabled{0};

// Failure injection: the attempt number (counted from the arming) that fails first,
// 0 when nothing is armed.
std::atomic<uint64_t> gFailAt{0};
std::atomic<uint64_t> gSinceArmed{0};
std::atomic<bool> gFailSticky{false};
std::atomic<uint64_t> gLockFailAt{0};
std::atomic<uint64_t> gLocksSinceArmed{0};

int gHeapTag = 0;

bool allocationFails() {
    gAllocations.fetch_add(1, std::memory_order_relaxed);
    const uint64_t at = gFailAt.load();
    if (at == 0) return false;
    const uint64_t n = gSinceArmed.fetch_add(1) + 1;
    return gFailSticky.load() ? n >= at : n == at;
}

}  // namespace

extern "C" {

HANDLE GetProcessHeap(void) { return &gHeapTag; }

LPVOID HeapAlloc(HANDLE heap, DWORD flags, SIZE_T bytes) {
    if (heap == nullptr || allocationFails()) return nullptr;
    auto *header = static_cast<BlockHeader *>(std::malloc(sizeof(BlockHeader) + bytes));
    if (header == nullptr) return nullptr;
    header->bytes = bytes;
    void *block = header + 1;
    if ((flags & HEAP_ZERO_MEMORY) != 0) std::memset(block, 0, bytes);
    gHeapBlocks.fetch_add(1);
    return block;
}

LPVOID HeapReAlloc(HANDLE heap, DWORD flags, LPVOID block, SIZE_T bytes) {
    if (heap == nullptr || block == nullptr || allocationFails()) return nullptr;
    auto *old = static_cast<BlockHeader *>(block) - 1;
    const size_t oldBytes = old->bytes;
    auto *header = static_cast<BlockHeader *>(std::realloc(old, sizeof(BlockHeader) + bytes));
    if (header == nullptr) return nullptr;
    header->bytes = bytes;
    void *result = header + 1;
    if ((flags & HEAP_ZERO_MEMORY) != 0 && bytes > oldBytes) {
        std::memset(static_cast<char *>(result) + oldBytes, 0, bytes - oldBytes);
    }
    return result;
}

BOOL HeapFree(HANDLE heap, DWORD flags, LPVOID block) {
    (void)flags;
    if (heap == nullptr) return 0;
    if (block == nullptr) return 1;
    std::free(static_cast<BlockHeader *>(block) - 1);
    gHeapBlocks.fetch_sub(1);
    return 1;
}

HGLOBAL GlobalAlloc(UINT flags, SIZE_T bytes) {
    if (allocationFails()) return nullptr;
    auto *handle = static_cast<GlobalBlock *>(std::malloc(sizeof(GlobalBlock)));
    if (handle == nullptr) return nullptr;
    handle->data = std::malloc(bytes == 0 ? 1 : bytes);
    if (handle->data == nullptr) {
        std::free(handle);
        return nullptr;
    }
    (void)flags;  // every block here is movable: the handle is not the memory
    handle->bytes = bytes;
    handle->locks = 0;
    gGlobalBlocks.fetch_add(1);
    return handle;
}

LPVOID GlobalLock(HGLOBAL mem) {
    if (mem == nullptr) return nullptr;
    const uint64_t at = gLockFailAt.load();
    if (at != 0 && gLocksSinceArmed.fetch_add(1) + 1 == at) return nullptr;
    auto *handle = static_cast<GlobalBlock *>(mem);
    handle->locks++;
    gGlobalLocks.fetch_add(1);
    return handle->data;
}

BOOL GlobalUnlock(HGLOBAL mem) {
    if (mem == nullptr) return 0;
    auto *handle = static_cast<GlobalBlock *>(mem);
    if (handle->locks == 0) return 0;
    handle->locks--;
    gGlobalLocks.fetch_sub(1);
    return handle->locks > 0 ? 1 : 0;
}

HGLOBAL GlobalFree(HGLOBAL mem) {
    if (mem == nullptr) return nullptr;
    auto *handle = static_cast<GlobalBlock *>(mem);
    gGlobalLocks.fetch_sub(handle->locks);
    std::free(handle->data);
    std::free(handle);
    gGlobalBlocks.fetch_sub(1);
    return nullptr;
}

BOOL DisableThreadLibraryCalls(HMODULE module) {
    (void)module;
    gThreadCallsDisabled.fetch_add(1);
    return 1;
}

}  // extern "C"

namespace anwin {

int64_t heapBlocks() { return gHeapBlocks.load(); }
int64_t globalBlocks() { return gGlobalBlocks.load(); }
int64_t globalLocks() { return gGlobalLocks.load(); }
uint64_t allocations() { return gAllocations.load(); }
void resetCounters() { gAllocations.store(0); }

void failAllocation(uint64_t n, bool sticky) {
    gSinceArmed.store(0);
    gFailSticky.store(sticky);
    gFailAt.store(n);
}

void failAllAllocations() { failAllocation(1, true); }

void failGlobalLock(uint64_t n) {
    gLocksSinceArmed.store(0);
    gLockFailAt.store(n);
}

void clearFailures() {
    gFailAt.store(0);
    gFailSticky.store(false);
    gLockFailAt.store(0);
}

int threadLibraryCallsDisabled() { return gThreadCallsDisabled.load(); }

}  // namespace anwin
