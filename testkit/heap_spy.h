// What a DLL takes from the C runtime heap and gives back, seen through its imports of
// msvcrt's malloc, calloc, realloc, _strdup and free (api_spy.h): the blocks it still holds,
// how many allocations a call made, and a null answer injected at the n-th allocation, as a
// full heap would give it. The blocks themselves come from the real functions, so the DLL
// works on unchanged.
//
// One spied module at a time; the record is shared by all threads. Allocation counts and
// the injected failure count only the thread that last called reset(), so a dialog driver's
// own calls into the library on another thread don't shift them.
#pragma once

#include <windows.h>

#include <cstddef>

namespace testkit::heap_spy {

// Points the module's heap imports at the spy. False when malloc, calloc or free is not
// imported by name (realloc and _strdup are spied on when imported).
bool install(HMODULE module);

// Forgets every block and count, disarms the failure and makes the calling thread the one
// counted.
void reset();

// The n-th allocation (1: the next) of the counted thread from now on returns null; 0 disarms.
void failAllocation(int n);

// From now on malloc and calloc hand out blocks `slack` bytes larger than asked, as a heap
// that rounds sizes up does (its _msize then reports the larger size); reset() ends it.
void roundUpBlocks(size_t slack);

// Allocations the counted thread made since reset(), the failed one included.
int allocationCount();

// The size asked for by the allocation that was made to fail; 0 when none was.
size_t failedSize();

// Blocks handed out since reset() on any thread and not yet freed.
size_t liveBlocks();

}  // namespace testkit::heap_spy
