// Reproducible test data: compressible text (words and line feeds) or incompressible
// pseudo-random bytes, so codec and stream tests exercise both ends of zlib's range without
// shipping data files.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace testkit {

// `size` bytes: text lines when `text`, else pseudo-random bytes; the same seed gives the
// same bytes.
inline std::vector<unsigned char> sampleData(size_t size, bool text, uint32_t seed = 12345) {
    std::vector<unsigned char> out;
    out.reserve(size);
    uint32_t x = seed;
    auto next = [&x] {  // xorshift32
        x ^= x << 13;
        x ^= x >> 17;
        x ^= x << 5;
        return x;
    };
    static const char* words[] = {"velzip", "stream", "header", "zlib", "tessel", "line", "block", "data"};
    while (out.size() < size) {
        if (text) {
            for (const char* p = words[next() % 8]; *p && out.size() < size; ++p) {
                out.push_back(static_cast<unsigned char>(*p));
            }
            if (out.size() < size) {
                out.push_back(next() % 9 == 0 ? '\n' : ' ');
            }
        } else {
            out.push_back(static_cast<unsigned char>(next() >> 24));
        }
    }
    return out;
}

}  // namespace testkit
