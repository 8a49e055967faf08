// What runs when the library is loaded into a process: per-thread attach and detach
// notifications are switched off, and nothing else happens.
#include "hosts/platform.h"

#if defined(_WIN32)

extern "C" BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID reserved) {
    (void)reserved;
    if (reason == DLL_PROCESS_ATTACH) DisableThreadLibraryCalls(instance);
    return TRUE;
}

#else

namespace {

// Stands for this library's module handle in the call below.
const char kModuleTag = 0;

__attribute__((constructor)) void ANLibraryEntry() {
    DisableThreadLibraryCalls(const_cast<char *>(&kModuleTag));
}

}  // namespace

#endif
