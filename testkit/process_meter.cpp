// Counting handles, heap, private bytes and windows of this process; see process_meter.h.
#include "process_meter.h"

#include <windows.h>

namespace testkit {

namespace {

// Handle values are multiples of 4. Probing stops after a long run of values that name
// nothing past the last one that did, so a sparse table is still counted whole.
long countHandles() {
    constexpr uintptr_t kStep = 4;
    constexpr uintptr_t kEmptyRunToStop = 16384;
    long count = 0;
    uintptr_t lastFound = 0;
    for (uintptr_t value = kStep; value - lastFound <= kEmptyRunToStop; value += kStep) {
        DWORD flags = 0;
        if (GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags)) {
            ++count;
            lastFound = value;
        }
    }
    return count;
}

void walkHeaps(ProcessSample* s) {
    HANDLE heaps[256];
    const DWORD total = GetProcessHeaps(256, heaps);
    const DWORD n = total < 256 ? total : 256;
    for (DWORD i = 0; i < n; ++i) {
        if (!HeapLock(heaps[i])) {
            continue;
        }
        PROCESS_HEAP_ENTRY entry{};
        while (HeapWalk(heaps[i], &entry)) {
            if (entry.wFlags & PROCESS_HEAP_ENTRY_BUSY) {
                s->heapBytes += entry.cbData;
                ++s->heapBlocks;
            }
        }
        HeapUnlock(heaps[i]);
    }
}

// Committed private memory, summed over the address space (Wine leaves PrivateUsage 0).
int64_t privateBytes() {
    int64_t total = 0;
    MEMORY_BASIC_INFORMATION region;
    for (const char* at = nullptr; VirtualQuery(at, &region, sizeof region) == sizeof region;) {
        if (region.State == MEM_COMMIT && region.Type == MEM_PRIVATE) {
            total += static_cast<int64_t>(region.RegionSize);
        }
        const char* next = static_cast<const char*>(region.BaseAddress) + region.RegionSize;
        if (next <= at) {
            break;  // the top of the address space
        }
        at = next;
    }
    return total;
}

BOOL CALLBACK countOwnWindow(HWND window, LPARAM parameter) {
    DWORD owner = 0;
    GetWindowThreadProcessId(window, &owner);
    if (owner == GetCurrentProcessId()) {
        ++*reinterpret_cast<long*>(parameter);
    }
    return TRUE;
}

}  // namespace

ProcessSample sampleProcess() {
    ProcessSample s;
    // Windows first: a process's first EnumWindows sets up Wine's window system (handles, a
    // few thousand heap blocks), which must land before the baseline, not in the first delta.
    EnumWindows(countOwnWindow, reinterpret_cast<LPARAM>(&s.windows));
    s.handles = countHandles();
    walkHeaps(&s);
    s.privateBytes = privateBytes();
    return s;
}

ProcessSample operator-(const ProcessSample& later, const ProcessSample& earlier) {
    ProcessSample d;
    d.handles = later.handles - earlier.handles;
    d.heapBytes = later.heapBytes - earlier.heapBytes;
    d.heapBlocks = later.heapBlocks - earlier.heapBlocks;
    d.privateBytes = later.privateBytes - earlier.privateBytes;
    d.windows = later.windows - earlier.windows;
    return d;
}

std::string describe(const ProcessSample& s) {
    return "handles " + std::to_string(s.handles) + ", heap " + std::to_string(s.heapBytes) + " B in " +
           std::to_string(s.heapBlocks) + " blocks, private " + std::to_string(s.privateBytes) +
           " B, windows " + std::to_string(s.windows);
}

}  // namespace testkit
