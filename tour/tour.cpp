// Loads libTessel_JNI.dll in the JNI host, lists its exports as the DLL itself holds them,
// and calls each family once. With --brief (the x64 twin's turn) only the exports whose names
// differ in kind from the x86 ones are listed: the byte counts under their long names.
#include <windows.h>

#include <cstdio>
#include <cstring>

#include "tour.h"

namespace {

constexpr const char* kArch = sizeof(void*) == 8 ? "x64, 64-bit" : "x86, 32-bit";

void printExports(HMODULE module, bool brief) {
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
    std::printf("libTessel_JNI.dll (%s) exports %lu functions%s:\n", kArch, exports->NumberOfNames,
                brief ? ", among them" : "");
    for (DWORD i = 0; i < exports->NumberOfNames; ++i) {
        const char* name = reinterpret_cast<const char*>(base + names[i]);
        if (!brief || std::strstr(name, "CompressedBytesN") != nullptr) {
            std::printf("  %s\n", name);
        }
    }
}

}  // namespace

int main(int argc, char** argv) {
    const bool brief = argc > 1 && std::strcmp(argv[1], "--brief") == 0;
    jnihost::Vm vm;
    jnihost::Library lib(vm);
    if (lib.handle() == nullptr) {
        std::fprintf(stderr, "cannot load libTessel_JNI.dll\n");
        return 1;
    }
    printExports(static_cast<HMODULE>(lib.handle()), brief);
    tourDesktop(vm, lib);
    tourVelzip(vm, lib);
    tourChoosers(vm, lib);
    tourRegistry(vm, lib);
    const size_t broken = vm.violations().size();
    std::printf("\nJNI rules broken during the tour: %u\n", static_cast<unsigned>(broken));
    return broken == 0 ? 0 : 1;
}
