// What zelbrin/container.cpp needs from the other units of libZelbrin.dll, given here so that
// a program can link the container unit alone: the observation log does nothing, and the
// platform's files are one file held in memory.
#pragma once

#include "internal.h"

#include <cstddef>

namespace fuzz {

struct MemoryFile {
    const unsigned char* data = nullptr;
    size_t size = 0;
    size_t pos = 0;
    size_t readLimit = 0;  // most bytes one read gives; 0: no limit
    size_t failAt = 0;     // a read that would reach this offset fails; 0: none fails
};

// Makes `file` the one file that osRead serves; the OsFile that names it.
Zel::OsFile openMemoryFile(const MemoryFile& file);

}  // namespace fuzz
