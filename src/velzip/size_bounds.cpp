// The bounds are computed in double and truncated toward zero, as Java's callers expect;
// the comparison is made in 64 bits, so a bound beyond 2^31 - 1, where a 32-bit truncation
// would be undefined (on x86 it gives INT_MIN and accepts every size), refuses the sizes.
// Wherever the bound fits 32 bits, the answers are those of the 32-bit formula.
#include "velzip/size_bounds.h"

#include <cstdint>

// i686's default x87 arithmetic can keep 80 bits, and then (137 - 36) / 1.01 comes out
// just under 100, refusing 137 for 100. The build uses SSE2 (true double).
#if defined(__FLT_EVAL_METHOD__) && __FLT_EVAL_METHOD__ != 0
#error "the Velzip size bounds need true double arithmetic: build with -msse2 -mfpmath=sse"
#endif

namespace velzip {

bool encodeSizesFit(int32_t dstSize, int32_t srcSize) {
    if (dstSize < 0 || srcSize < 0) {
        return false;
    }
    const double bound = static_cast<double>(srcSize) * 1.01 + 36.0;
    return static_cast<int64_t>(dstSize) >= static_cast<int64_t>(bound);
}

bool decodeSizesFit(int32_t dstSize, int32_t srcSize) {
    if (dstSize < 0 || srcSize < 0) {
        return false;
    }
    const double capacity = static_cast<double>(static_cast<int64_t>(dstSize) - 36) / 1.01;
    return static_cast<int64_t>(capacity) >= static_cast<int64_t>(srcSize);
}

}  // namespace velzip
