// The size checks of encodeMemN and decodeMemN, apart from the arrays, so that tests can
// compare them with the plain 32-bit formula over the whole range of sizes.
#pragma once

#include <cstdint>

namespace velzip {

// True when dstSize is at least srcSize * 1.01 + 36, computed in double and truncated toward
// zero. Negative sizes are refused.
bool encodeSizesFit(int32_t dstSize, int32_t srcSize);

// True when (dstSize - 36) / 1.01, computed in double and truncated toward zero, is at least
// srcSize. Negative sizes are refused.
bool decodeSizesFit(int32_t dstSize, int32_t srcSize);

}  // namespace velzip
