// UTF-8, UTF-16 and modified UTF-8 conversions for the host and its tests.
#include <windows.h>

#include <algorithm>

#include "vm_state.h"

namespace jnihost {

std::u16string utf16(const std::string& s) {
    std::u16string out(s.size(), u'\0');  // never more units than bytes
    const int n = MultiByteToWideChar(CP_UTF8, 0, s.data(), static_cast<int>(s.size()),
                                      reinterpret_cast<wchar_t*>(&out[0]), static_cast<int>(out.size()));
    out.resize(std::max(n, 0));
    return out;
}

std::string utf8(const std::u16string& s) {
    std::string out(s.size() * 3, '\0');  // a unit takes at most 3 bytes, a pair 4
    const int n = WideCharToMultiByte(CP_UTF8, 0, reinterpret_cast<const wchar_t*>(s.data()),
                                      static_cast<int>(s.size()), &out[0], static_cast<int>(out.size()),
                                      nullptr, nullptr);
    out.resize(std::max(n, 0));
    return out;
}

std::string toModifiedUtf8(const std::u16string& s) {
    std::string out;
    for (const char16_t u : s) {
        if (u != 0 && u < 0x80) {
            out += static_cast<char>(u);
        } else if (u < 0x800) {  // U+0000 too, as C0 80
            out += static_cast<char>(0xC0 | (u >> 6));
            out += static_cast<char>(0x80 | (u & 0x3F));
        } else {  // surrogates one by one
            out += static_cast<char>(0xE0 | (u >> 12));
            out += static_cast<char>(0x80 | ((u >> 6) & 0x3F));
            out += static_cast<char>(0x80 | (u & 0x3F));
        }
    }
    return out;
}

bool fromModifiedUtf8(const char* s, std::u16string& out) {
    bool wellFormed = true;
    for (auto p = reinterpret_cast<const unsigned char*>(s); *p;) {
        const int n = *p < 0x80 ? 1 : (*p >> 5) == 6 ? 2 : (*p >> 4) == 14 ? 3 : 0;  // no 4-byte forms
        char16_t u = *p & (n == 1 ? 0x7F : n == 2 ? 0x1F : 0x0F);
        bool ok = n > 0;
        for (int k = 1; ok && k < n; ++k) {
            ok = (p[k] & 0xC0) == 0x80;  // also stops at the terminator
            u = static_cast<char16_t>((u << 6) | (p[k] & 0x3F));
        }
        wellFormed = wellFormed && ok;
        out += ok ? u : u'\xFFFD';
        p += ok ? n : 1;
    }
    return wellFormed;
}

}  // namespace jnihost
