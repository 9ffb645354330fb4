// Adversarial text and sizes, and the models of the library's text conversions.
#include "fuzz_text.h"

#include <windows.h>

#include <climits>

namespace fuzz {

namespace {

// Character pools: ASCII, Latin-1 and the code page's own letters (round trip exactly under
// 1252), characters outside it (become '?'), path and registry punctuation, and the units
// that break naive code (NUL, lone surrogates, a surrogate pair, U+FFFF).
const std::vector<std::u16string> kPools = {
    u"abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789",
    u"\u00e9\u00fc\u00df\u00c5\u00f1\u00e6\u20ac\u0153\u2122",
    u"\u0416\u6f22\u05d0\u0e01\u2603\u3042",
    u"\\/ .:*?\"<>|%;=,\t\n",
    std::u16string(u"\0", 1) + u"\xd800\xdc00\xffff" + u"\xd83d\xde00",
};

std::u16string textOfLength(Rng& rng, size_t length) {
    std::u16string out;
    out.reserve(length);
    // Mostly one pool, so long texts are not all noise; the exotic pools stay rare.
    const std::u16string& main = kPools[rng.below(3)];
    while (out.size() < length) {
        const std::u16string& pool = rng.chance(85) ? main : kPools[rng.below(kPools.size())];
        out += pool[rng.below(static_cast<uint32_t>(pool.size()))];
    }
    return out;
}

size_t longLength(Rng& rng) {
    static const size_t lengths[] = {300, 1000, 40000};
    return lengths[rng.below(3)];
}

}  // namespace

std::u16string anyText(Rng& rng) {
    switch (rng.below(10)) {
        case 0:
            return u"";
        case 1:
        case 2:
            return textOfLength(rng, longLength(rng));
        default:
            return textOfLength(rng, rng.range(1, 40));
    }
}

std::u16string nameText(Rng& rng, bool allowEmpty) {
    if (allowEmpty && rng.chance(5)) {
        return u"";
    }
    return textOfLength(rng, rng.chance(8) ? longLength(rng) : rng.range(1, 24));
}

std::u16string plainText(Rng& rng, size_t length) {
    std::u16string out;
    for (size_t i = 0; i < length; ++i) {
        out += kPools[0][rng.below(static_cast<uint32_t>(kPools[0].size()))];
    }
    return out;
}

jint anyLength(Rng& rng, jint arrayLength) {
    switch (rng.below(12)) {
        case 0:
            return 0;
        case 1:
            return -1;
        case 2:
            return INT_MIN;
        case 3:
            return INT_MAX;
        case 4:
            return arrayLength + 1;
        case 5:
            return arrayLength + static_cast<jint>(rng.range(2, 1 << 20));
        case 6:
            return static_cast<jint>(rng.range(INT_MIN + 1, -2));
        case 7:
        case 8:
            return arrayLength;
        default:
            return static_cast<jint>(rng.range(0, arrayLength));
    }
}

Bytes randomBytes(Rng& rng, size_t size) {
    Bytes out(size);
    for (auto& b : out) {
        b = static_cast<uint8_t>(rng.next());
    }
    return out;
}

std::string ansiBytes(const std::u16string& text) {
    const auto* wide = reinterpret_cast<const wchar_t*>(text.data());
    const int length = static_cast<int>(text.size());
    const int n = WideCharToMultiByte(CP_ACP, 0, wide, length, nullptr, 0, nullptr, nullptr);
    std::string out(n > 0 ? n : 0, '\0');
    if (n > 0) {
        WideCharToMultiByte(CP_ACP, 0, wide, length, &out[0], n, nullptr, nullptr);
    }
    return out;
}

std::string cutAtNul(const std::string& bytes) {
    return bytes.substr(0, bytes.find('\0'));
}

std::u16string fromAnsi(const std::string& bytes) {
    const int n = MultiByteToWideChar(CP_ACP, 0, bytes.c_str(), -1, nullptr, 0);
    std::u16string out(n > 1 ? n - 1 : 0, u'\0');
    if (n > 1) {
        MultiByteToWideChar(CP_ACP, 0, bytes.c_str(), -1, reinterpret_cast<wchar_t*>(&out[0]), n);
    }
    return out;
}

std::u16string upperCase(const std::u16string& text) {
    std::u16string out = text;
    if (!out.empty()) {
        CharUpperBuffW(reinterpret_cast<wchar_t*>(&out[0]), static_cast<DWORD>(out.size()));
    }
    return out;
}

bool isModifiedUtf8(const uint8_t* bytes, size_t size, std::u16string* text) {
    const std::string s(bytes, bytes + size);
    std::u16string decoded;
    const bool ok = s.find('\0') == std::string::npos && jnihost::fromModifiedUtf8(s.c_str(), decoded);
    if (text != nullptr) {
        *text = decoded;
    }
    return ok;
}

std::string show(const std::u16string& text) {
    std::u16string head = text.substr(0, 60);
    for (auto& u : head) {
        if (u < 0x20 || (u >= 0xD800 && u < 0xE000)) {
            u = u'\u00b7';  // control characters and surrogates shown as a dot
        }
    }
    const int n = WideCharToMultiByte(CP_UTF8, 0, reinterpret_cast<const wchar_t*>(head.data()),
                                      static_cast<int>(head.size()), nullptr, 0, nullptr, nullptr);
    std::string out(n > 0 ? n : 0, '\0');
    if (n > 0) {
        WideCharToMultiByte(CP_UTF8, 0, reinterpret_cast<const wchar_t*>(head.data()),
                            static_cast<int>(head.size()), &out[0], n, nullptr, nullptr);
    }
    return "\"" + out + (text.size() > 60 ? "...\"" : "\"") + " (" + std::to_string(text.size()) + " chars)";
}

std::string showBytes(const Bytes& bytes) {
    std::string out;
    for (size_t i = 0; i < bytes.size() && i < 24; ++i) {
        out += "0123456789abcdef"[bytes[i] >> 4];
        out += "0123456789abcdef"[bytes[i] & 15];
    }
    return out + (bytes.size() > 24 ? "... (" : " (") + std::to_string(bytes.size()) + " bytes)";
}

}  // namespace fuzz
