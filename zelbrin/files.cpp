// What both platforms' files share: paths decoded from (modified) UTF-8, and full reads.
#include "internal.h"

namespace Zel {

bool decodeUtf8(const char* text, std::u16string& out) {
    out.clear();
    if (text == nullptr) {
        return false;
    }
    auto* p = reinterpret_cast<const unsigned char*>(text);
    auto cont = [](unsigned char c) { return (c & 0xC0) == 0x80; };
    while (*p != 0) {
        uint32_t c = *p;
        if (c < 0x80) {
            out.push_back(static_cast<char16_t>(c));
            p += 1;
        } else if ((c & 0xE0) == 0xC0 && cont(p[1])) {
            c = (c & 0x1F) << 6 | (p[1] & 0x3F);
            if (c < 0x80) {
                return false;  // overlong, or C0 80: a NUL cannot be part of a path
            }
            out.push_back(static_cast<char16_t>(c));
            p += 2;
        } else if ((c & 0xF0) == 0xE0 && cont(p[1]) && cont(p[2])) {
            c = (c & 0x0F) << 12 | (p[1] & 0x3F) << 6 | (p[2] & 0x3F);
            if (c < 0x800) {
                return false;
            }
            out.push_back(static_cast<char16_t>(c));
            p += 3;
        } else if ((c & 0xF8) == 0xF0 && cont(p[1]) && cont(p[2]) && cont(p[3])) {
            c = (c & 0x07) << 18 | (p[1] & 0x3F) << 12 | (p[2] & 0x3F) << 6 | (p[3] & 0x3F);
            if (c < 0x10000 || c > 0x10FFFF) {
                return false;
            }
            out.push_back(static_cast<char16_t>(0xD800 + ((c - 0x10000) >> 10)));
            out.push_back(static_cast<char16_t>(0xDC00 + ((c - 0x10000) & 0x3FF)));
            p += 4;
        } else {
            return false;
        }
    }
    for (size_t i = 0; i < out.size(); ++i) {
        const char16_t u = out[i];
        if (u >= 0xD800 && u < 0xDC00) {
            if (i + 1 >= out.size() || out[i + 1] < 0xDC00 || out[i + 1] >= 0xE000) {
                return false;
            }
            ++i;
        } else if (u >= 0xDC00 && u < 0xE000) {
            return false;
        }
    }
    return !out.empty();
}

long osReadFull(OsFile f, unsigned char* buffer, size_t count) {
    size_t total = 0;
    while (total < count) {
        const long got = osRead(f, buffer + total, count - total);
        if (got < 0) {
            return -1;
        }
        if (got == 0) {
            break;
        }
        total += static_cast<size_t>(got);
    }
    return static_cast<long>(total);
}

}  // namespace Zel
