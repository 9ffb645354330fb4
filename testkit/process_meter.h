// What a leak leaves behind in this process, counted in ways that work under Wine too
// (where GetProcessHandleCount and GetGuiResources answer 0): handles by probing handle
// values, the heap by walking every heap of the process, private bytes, and the top-level
// windows the process owns. For soaks and thread-churn tests: sample before, during and after
// a loop and compare.
#pragma once

#include <cstdint>
#include <string>

namespace testkit {

struct ProcessSample {
    long handles = 0;          // kernel handles that GetHandleInformation accepts
    int64_t heapBytes = 0;     // bytes in busy blocks over all heaps of the process
    long heapBlocks = 0;       // busy blocks over all heaps
    int64_t privateBytes = 0;  // committed private memory (VirtualQuery over the address space)
    long windows = 0;          // top-level windows owned by this process
};

// One sample. It allocates nothing on the heap itself, so taking it changes none of the
// figures it reads.
ProcessSample sampleProcess();

// Later minus earlier, field by field.
ProcessSample operator-(const ProcessSample& later, const ProcessSample& earlier);

// "handles 3, heap 1024 B in 12 blocks, private 65536 B, windows 1".
std::string describe(const ProcessSample& s);

}  // namespace testkit
