// The allocation functions behind `new (std::nothrow)`, the only form the library uses.
// The runtime's own versions call the throwing form and catch its std::bad_alloc, and an
// exception, once raised, leaves per-thread records behind (the exception globals in
// emulated TLS, the threads library's record of the thread) that only TLS callbacks free
// at thread exit; this DLL has none (dll_main.cpp). Asking malloc directly makes a failed
// allocation a plain null on any thread. The runtime's operator delete frees with free.
#include <cstdlib>
#include <new>

void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    return std::malloc(size != 0 ? size : 1);
}

void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
    return std::malloc(size != 0 ? size : 1);
}
