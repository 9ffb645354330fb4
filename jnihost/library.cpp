// Library: the DLL under test and calls of its exports. On x86 an assembly thunk makes the
// call, so that a wrong argument size (@N) shows up as a reported stack imbalance, not a
// crash; on x64 a plain call of as many integer arguments as the native takes.
#include <windows.h>

#include "vm_state.h"

namespace jnihost {

namespace {

#if defined(_WIN64)
// x64 has one calling convention: the first four arguments in registers, the rest on the
// stack, each in a slot of 8 bytes; the caller owns the stack, so nothing can be unbalanced.
// Every JNI argument here is an integer or a pointer, so a function of N 64-bit integers
// receives the same registers and slots as the native's own signature.
uint64_t callNative(const void* fn, const uintptr_t* a, int count, int32_t* imbalance) {
    using U = uintptr_t;
    *imbalance = 0;
    const auto entry = reinterpret_cast<uintptr_t>(fn);
    switch (count) {
        case 2:
            return reinterpret_cast<U (*)(U, U)>(entry)(a[0], a[1]);
        case 3:
            return reinterpret_cast<U (*)(U, U, U)>(entry)(a[0], a[1], a[2]);
        case 4:
            return reinterpret_cast<U (*)(U, U, U, U)>(entry)(a[0], a[1], a[2], a[3]);
        case 5:
            return reinterpret_cast<U (*)(U, U, U, U, U)>(entry)(a[0], a[1], a[2], a[3], a[4]);
        case 6:
            return reinterpret_cast<U (*)(U, U, U, U, U, U)>(entry)(a[0], a[1], a[2], a[3], a[4], a[5]);
        case 7:
            return reinterpret_cast<U (*)(U, U, U, U, U, U, U)>(entry)(a[0], a[1], a[2], a[3], a[4], a[5],
                                                                       a[6]);
        case 8:
            return reinterpret_cast<U (*)(U, U, U, U, U, U, U, U)>(entry)(a[0], a[1], a[2], a[3], a[4], a[5],
                                                                          a[6], a[7]);
        default:  // the env alone
            return reinterpret_cast<U (*)(U)>(entry)(a[0]);
    }
}
#else
// uint64_t jnihost_call_stdcall(fn, slots, count, int32_t* imbalance), cdecl.
// Copies the slots to a 16-byte aligned block on the stack and calls fn. Afterwards ESP
// should be where a __stdcall callee that popped exactly count*4 bytes leaves it; the
// difference goes to *imbalance (positive: it popped too much). ESP is restored from EBX.
extern "C" uint64_t jnihost_call_stdcall(const void* fn, const uintptr_t* slots, int count,
                                         int32_t* imbalance);
asm(R"(
    .text
    .globl _jnihost_call_stdcall
    .def _jnihost_call_stdcall; .scl 2; .type 32; .endef
_jnihost_call_stdcall:
    pushl %ebp
    movl %esp, %ebp
    pushl %ebx
    pushl %esi
    pushl %edi
    movl %esp, %ebx
    movl 16(%ebp), %ecx
    leal 0(,%ecx,4), %edx
    subl %edx, %esp
    andl $-16, %esp
    leal (%esp,%edx), %edi
    movl 12(%ebp), %esi
    xorl %eax, %eax
1:  cmpl %ecx, %eax
    jge 2f
    movl (%esi,%eax,4), %edx
    movl %edx, (%esp,%eax,4)
    incl %eax
    jmp 1b
2:  call *8(%ebp)
    movl %esp, %ecx
    subl %edi, %ecx
    movl 20(%ebp), %esi
    movl %ecx, (%esi)
    movl %ebx, %esp
    popl %edi
    popl %esi
    popl %ebx
    popl %ebp
    ret
)");

uint64_t callNative(const void* fn, const uintptr_t* slots, int count, int32_t* imbalance) {
    return jnihost_call_stdcall(fn, slots, count, imbalance);
}
#endif

}  // namespace

const char* exportNameFor(void* module, const char* x86Name, int javaArgCount, std::string* storage) {
    auto exported = [module](const std::string& name) {
        return module != nullptr && GetProcAddress(static_cast<HMODULE>(module), name.c_str()) != nullptr;
    };
#if defined(_WIN64)
    std::string plain = x86Name;
    const size_t at = plain.rfind('@');
    if (at != std::string::npos && at + 1 < plain.size() &&
        plain.find_first_not_of("0123456789", at + 1) == std::string::npos) {
        plain.erase(at);
    }
    if (plain.rfind("_Java_", 0) == 0) {
        plain.erase(0, 1);
    }
    if (!exported(plain) && javaArgCount == 0 && exported(plain + "__")) {
        plain += "__";
    }
    *storage = plain;
#else
    (void)javaArgCount;
    *storage = x86Name;
#endif
    return exported(*storage) ? storage->c_str() : nullptr;
}

Library::Library(Vm& vm, const char* path) : vm_(vm) {
    module_ = LoadLibraryA(path);
    if (!module_) {
        vm_.state().report(std::string("LoadLibraryA(\"") + path + "\") failed, GetLastError " +
                           std::to_string(GetLastError()));
    }
}

Library::~Library() {
    if (module_)
        FreeLibrary(static_cast<HMODULE>(module_));
}

void* Library::find(const char* exportName) const {
    return module_ ? reinterpret_cast<void*>(GetProcAddress(static_cast<HMODULE>(module_), exportName))
                   : nullptr;
}

uint64_t Library::invoke(const char* exportName, const uintptr_t* slots, int slotCount) {
    VmState& s = vm_.state();
    // The env and the class or object come first (only x64 counts the rest: one slot each).
    std::string name;
    const void* fn = nullptr;
    if (const char* found = exportNameFor(module_, exportName, slotCount - 2, &name)) {
        fn = find(found);
    }
    if (!fn) {
        s.report(std::string(exportName) + ": " + (module_ ? "no such export" : "the library is not loaded"));
        return 0;
    }
    uint64_t serial;
    {
        std::lock_guard<std::recursive_mutex> g(s.mu);
        serial = s.nextSerial;
    }
    int32_t imbalance = 0;
    const uint64_t result = callNative(fn, slots, slotCount, &imbalance);
    if (imbalance != 0) {
        s.report(std::string(exportName) + ": stack imbalance of " + std::to_string(imbalance) +
                 " bytes: the callee popped " + std::to_string(slotCount * 4 + imbalance) + " bytes, its " +
                 std::to_string(slotCount) + " argument slots take " + std::to_string(slotCount * 4) +
                 " (wrong @N, or not __stdcall)");
    }
    s.afterCall(exportName, GetCurrentThreadId(), serial);
    return result;
}

}  // namespace jnihost
