// The heap spy's replacements call the test program's own msvcrt functions: the same heap
// the DLL uses, through imports of this program that are not patched.
#include "heap_spy.h"

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <unordered_set>

#include "api_spy.h"

namespace testkit::heap_spy {
namespace {

struct Record {
    std::mutex mu;
    std::unordered_set<uintptr_t> live;  // block addresses
    DWORD countedThread = 0;
    int count = 0;
    int failAt = 0;
    size_t failedSize = 0;
    size_t slack = 0;
};
Record& record() {
    static Record r;  // outlives every DLL that may still call in while the program ends
    return r;
}

// Counts an allocation of the counted thread; true when it is the one to fail.
bool countAndDecide(size_t size) {
    Record& r = record();
    std::lock_guard<std::mutex> lock(r.mu);
    if (GetCurrentThreadId() != r.countedThread) {
        return false;
    }
    if (++r.count != r.failAt) {
        return false;
    }
    r.failedSize = size;
    return true;
}

void* handedOut(void* block) {
    if (block != nullptr) {
        std::lock_guard<std::mutex> lock(record().mu);
        record().live.insert(reinterpret_cast<uintptr_t>(block));
    }
    return block;
}

void takenBack(uintptr_t address) {
    std::lock_guard<std::mutex> lock(record().mu);
    record().live.erase(address);
}

size_t slack() {
    std::lock_guard<std::mutex> lock(record().mu);
    return record().slack;
}

void* __cdecl spyMalloc(size_t size) {
    return countAndDecide(size) ? nullptr : handedOut(std::malloc(size + slack()));
}
void* __cdecl spyCalloc(size_t count, size_t size) {
    return countAndDecide(count * size) ? nullptr : handedOut(std::calloc(count * size + slack(), 1));
}
char* __cdecl spyStrdup(const char* text) {
    return countAndDecide(std::strlen(text) + 1) ? nullptr : static_cast<char*>(handedOut(_strdup(text)));
}
// GCC moves the reading of the old address past the realloc and then warns of its use; the
// address only ever names an entry of the record, never memory.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wuse-after-free"
void* __cdecl spyRealloc(void* block, size_t size) {
    if (block != nullptr && size == 0) {
        takenBack(reinterpret_cast<uintptr_t>(block));  // msvcrt frees the block and gives null
        return std::realloc(block, 0);
    }
    if (countAndDecide(size)) {
        return nullptr;  // the old block stays the caller's
    }
    const auto old = reinterpret_cast<uintptr_t>(block);
    void* moved = std::realloc(block, size);
    if (moved != nullptr && old != 0) {
        takenBack(old);
    }
    return handedOut(moved);
}
#pragma GCC diagnostic pop
void __cdecl spyFree(void* block) {
    if (block != nullptr) {
        takenBack(reinterpret_cast<uintptr_t>(block));
    }
    std::free(block);
}

}  // namespace

bool install(HMODULE module) {
    patchImport(module, "realloc", reinterpret_cast<void*>(spyRealloc));
    patchImport(module, "_strdup", reinterpret_cast<void*>(spyStrdup));
    return patchImport(module, "malloc", reinterpret_cast<void*>(spyMalloc)) &&
           patchImport(module, "calloc", reinterpret_cast<void*>(spyCalloc)) &&
           patchImport(module, "free", reinterpret_cast<void*>(spyFree));
}

void reset() {
    Record& r = record();
    std::lock_guard<std::mutex> lock(r.mu);
    r.live.clear();
    r.countedThread = GetCurrentThreadId();
    r.count = 0;
    r.failAt = 0;
    r.failedSize = 0;
    r.slack = 0;
}

void roundUpBlocks(size_t slack) {
    std::lock_guard<std::mutex> lock(record().mu);
    record().slack = slack;
}

void failAllocation(int n) {
    Record& r = record();
    std::lock_guard<std::mutex> lock(r.mu);
    r.failAt = n == 0 ? 0 : r.count + n;
}

int allocationCount() {
    std::lock_guard<std::mutex> lock(record().mu);
    return record().count;
}

size_t failedSize() {
    std::lock_guard<std::mutex> lock(record().mu);
    return record().failedSize;
}

size_t liveBlocks() {
    std::lock_guard<std::mutex> lock(record().mu);
    return record().live.size();
}

}  // namespace testkit::heap_spy
