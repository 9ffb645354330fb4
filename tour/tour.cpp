// Loads libTessel_JNI.dll in the JNI host, lists its exports as the DLL itself holds them,
// and calls each family once.
#include <windows.h>

#include <cstdio>

#include "tour.h"

namespace {

void printExports(HMODULE module) {
    auto* base = reinterpret_cast<const BYTE*>(module);
    auto* dos = reinterpret_cast<const IMAGE_DOS_HEADER*>(base);
    auto* nt = reinterpret_cast<const IMAGE_NT_HEADERS*>(base + dos->e_lfanew);
    const IMAGE_DATA_DIRECTORY& dir = nt->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_EXPORT];
    if (dir.Size == 0) {
        std::printf("no exports\n");
        return;
    }
    auto* exports = reinterpret_cast<const IMAGE_EXPORT_DIRECTORY*>(base + dir.VirtualAddress);
    auto* names = reinterpret_cast<const DWORD*>(base + exports->AddressOfNames);
    std::printf("libTessel_JNI.dll exports %lu functions:\n", exports->NumberOfNames);
    for (DWORD i = 0; i < exports->NumberOfNames; ++i) {
        std::printf("  %s\n", reinterpret_cast<const char*>(base + names[i]));
    }
}

}  // namespace

int main() {
    jnihost::Vm vm;
    jnihost::Library lib(vm);
    if (lib.handle() == nullptr) {
        std::fprintf(stderr, "cannot load libTessel_JNI.dll\n");
        return 1;
    }
    printExports(static_cast<HMODULE>(lib.handle()));
    tourDesktop(vm, lib);
    tourVelzip(vm, lib);
    tourChoosers(vm, lib);
    tourRegistry(vm, lib);
    const size_t broken = vm.violations().size();
    std::printf("\nJNI rules broken during the tour: %u\n", static_cast<unsigned>(broken));
    return broken == 0 ? 0 : 1;
}
