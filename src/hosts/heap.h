// The library's only way to memory: the process heap and movable global memory of
// the platform layer. No other allocator is used anywhere in the library.
#ifndef ANNO_HOSTS_HEAP_H
#define ANNO_HOSTS_HEAP_H

#include <cstddef>

#include "hosts/platform.h"

// A process-heap block of `bytes`, zeroed when `zero` is set; null on failure.
inline void *ANHeapAlloc(size_t bytes, bool zero = false) {
    return HeapAlloc(GetProcessHeap(), zero ? HEAP_ZERO_MEMORY : 0, bytes);
}

// Resizes a process-heap block. On failure returns null and `block` stays valid and
// unchanged; the caller keeps using it.
inline void *ANHeapReAlloc(void *block, size_t bytes) {
    return HeapReAlloc(GetProcessHeap(), 0, block, bytes);
}

// Frees a process-heap block; null is ignored.
inline void ANHeapFree(void *block) {
    if (block != nullptr) HeapFree(GetProcessHeap(), 0, block);
}

// Typed forms for the records the library keeps.
template <typename T>
inline T *ANHeapNew(size_t count = 1, bool zero = true) {
    return static_cast<T *>(ANHeapAlloc(sizeof(T) * count, zero));
}

#endif  // ANNO_HOSTS_HEAP_H
