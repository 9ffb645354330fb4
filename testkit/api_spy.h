// Watching what a DLL hands to Windows: one slot of its import table is pointed at a spy
// with the same signature, which records the call and passes it on to the real function.
// The DLL is unchanged on disk and no other module is affected, so the real Windows code
// still shows the dialog or moves the window, and the test sees both the arguments the
// library chose and their effect.
#pragma once

#include <windows.h>

namespace testkit {

// Points the module's import of `function` (imported by name, from any DLL) at
// `replacement`. False when the module does not import it by name.
bool patchImport(HMODULE module, const char* function, void* replacement);

}  // namespace testkit
