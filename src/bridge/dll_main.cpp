// The library's entry point. The runtime constructs the static objects before it and
// destroys them after process detach; the handler itself only switches off thread
// notifications, which no part of the library needs.
#include <windows.h>

// Windows refuses DisableThreadLibraryCalls for a module with a TLS directory, and the
// mingw-w64 runtime adds one whenever its TLS support object is linked. The runtime's DLL
// start-up calls this pointer only when it is set; defining it here, null, keeps that
// object (and with it the TLS directory and its callbacks) out of the DLL. Those callbacks
// free the runtime's per-thread records at thread exit; the library keeps no per-thread data
// and raises no exception (nothrow_new.cpp), so no thread ever gets such a record.
extern "C" const PIMAGE_TLS_CALLBACK __dyn_tls_init_callback = nullptr;

extern "C" BOOL WINAPI DllMain(HINSTANCE module, DWORD reason, LPVOID /*reserved*/) {
    if (reason == DLL_PROCESS_ATTACH) {
        DisableThreadLibraryCalls(module);
    }
    return TRUE;
}
