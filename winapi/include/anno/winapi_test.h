// Test controls of anno_winapi, the process-heap, global-memory and library-entry
// functions that stand in for the Windows ones on other systems: live-block counters,
// allocation counters and failure injection. Not available on Windows, where the
// library uses the system's own functions.
#ifndef ANNO_WINAPI_TEST_H
#define ANNO_WINAPI_TEST_H

#include <cstdint>

#define ANWIN_API __attribute__((visibility("default")))

namespace anwin {

// Process-heap blocks allocated and not yet freed.
ANWIN_API int64_t heapBlocks();
// Global-memory blocks allocated and not yet freed.
ANWIN_API int64_t globalBlocks();
// Global-memory blocks currently locked (GlobalLock without its GlobalUnlock).
ANWIN_API int64_t globalLocks();
// Allocation attempts (HeapAlloc, HeapReAlloc, GlobalAlloc) since resetCounters().
ANWIN_API uint64_t allocations();
ANWIN_API void resetCounters();

// Makes the n-th allocation attempt from now (n = 1: the next one) fail; with
// `sticky`, that one and every later one fail. A failed HeapReAlloc keeps the block.
ANWIN_API void failAllocation(uint64_t n, bool sticky = false);
// Makes every allocation attempt fail until clearFailures().
ANWIN_API void failAllAllocations();
// Makes the n-th GlobalLock from now fail.
ANWIN_API void failGlobalLock(uint64_t n);
ANWIN_API void clearFailures();

// How many times DisableThreadLibraryCalls was called in this process.
ANWIN_API int threadLibraryCallsDisabled();

}  // namespace anwin

#endif  // ANNO_WINAPI_TEST_H
