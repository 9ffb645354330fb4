// The other units' part, for programs that link zelbrin/container.cpp alone.
#include "container_alone.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

constexpr Zel::OsFile kMemoryFid = 1000;
fuzz::MemoryFile memory;

[[noreturn]] void unexpected(const char* what) {
    std::fprintf(stderr, "container_alone: %s is not expected of an input stream\n", what);
    std::abort();
}

}  // namespace

namespace fuzz {

Zel::OsFile openMemoryFile(const MemoryFile& file) {
    memory = file;
    return kMemoryFid;
}

}  // namespace fuzz

namespace Zel {

void note(const char*) noexcept {}
void notef(const char*, ...) noexcept {}
void countCompressor() noexcept {}

long osRead(OsFile f, unsigned char* buffer, size_t count) {
    if (f != kMemoryFid) {
        unexpected("a read of another file");
    }
    if (memory.readLimit != 0) {
        count = std::min(count, memory.readLimit);
    }
    count = std::min(count, memory.size - memory.pos);
    if (memory.failAt != 0 && memory.pos + count >= memory.failAt) {
        return -1;
    }
    std::memcpy(buffer, memory.data + memory.pos, count);
    memory.pos += count;
    return static_cast<long>(count);
}

bool osClose(OsFile f) {
    return f == kMemoryFid;
}

bool osWriteAll(OsFile, const unsigned char*, size_t) {
    unexpected("a write");
}

bool osRewind(OsFile) {
    unexpected("a rewind");
}

}  // namespace Zel
