/* The Windows platform functions the library calls: process heap, movable global
 * memory and the library-entry switch. On Windows they come from KERNEL32; on other
 * systems a host provides them with C linkage (the in-tree anno_winapi does). */
#ifndef ANNO_HOSTS_PLATFORM_H
#define ANNO_HOSTS_PLATFORM_H

#include <stddef.h>
#include <stdint.h>

#if defined(_WIN32)
#ifndef WIN32_LEAN_AND_MEAN
#define WIN32_LEAN_AND_MEAN
#endif
#include <windows.h>
#else

#if defined(ANNO_BUILDING_WINAPI)
#define AN_WINAPI_API __attribute__((visibility("default")))
#else
#define AN_WINAPI_API
#endif

typedef void *HANDLE;
typedef void *HGLOBAL;
typedef void *HMODULE;
typedef void *LPVOID;
typedef uint32_t DWORD;
typedef unsigned UINT;
typedef int BOOL;
typedef size_t SIZE_T;

#define HEAP_ZERO_MEMORY 0x00000008u
#define GMEM_MOVEABLE 0x0002u

#ifdef __cplusplus
extern "C" {
#endif
AN_WINAPI_API HANDLE GetProcessHeap(void);
AN_WINAPI_API LPVOID HeapAlloc(HANDLE heap, DWORD flags, SIZE_T bytes);
AN_WINAPI_API LPVOID HeapReAlloc(HANDLE heap, DWORD flags, LPVOID block, SIZE_T bytes);
AN_WINAPI_API BOOL HeapFree(HANDLE heap, DWORD flags, LPVOID block);
AN_WINAPI_API HGLOBAL GlobalAlloc(UINT flags, SIZE_T bytes);
AN_WINAPI_API LPVOID GlobalLock(HGLOBAL mem);
AN_WINAPI_API BOOL GlobalUnlock(HGLOBAL mem);
AN_WINAPI_API HGLOBAL GlobalFree(HGLOBAL mem);
AN_WINAPI_API BOOL DisableThreadLibraryCalls(HMODULE module);
#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* _WIN32 */

#endif /* ANNO_HOSTS_PLATFORM_H */
