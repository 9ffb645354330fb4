// The library's entry point. The runtime constructs the static objects before it and
// destroys them after process detach; the handler itself only switches off thread
// notifications, which no part of the library needs.
#include <windows.h>

extern "C" BOOL WINAPI DllMain(HINSTANCE module, DWORD reason, LPVOID /*reserved*/) {
    if (reason == DLL_PROCESS_ATTACH) {
        DisableThreadLibraryCalls(module);
    }
    return TRUE;
}
