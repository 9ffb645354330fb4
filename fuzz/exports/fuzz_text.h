// Adversarial Java values for the fuzz driver: text of the lengths and characters that break
// conversions (300, 1,000 and 40,000 characters; characters outside the ANSI code page; lone
// surrogates; embedded U+0000), sizes around array ends, and what the library's text paths
// must make of them.
#pragma once

#include <jni.h>

#include <cstdint>
#include <string>
#include <vector>

#include "fuzz_case.h"

namespace fuzz {

using Bytes = std::vector<uint8_t>;

// Any text: empty, short, or one of the long lengths, from a mix of character pools.
std::u16string anyText(Rng& rng);
// Shorter text for names and path components (mostly under 40 characters, now and then one
// of the long lengths), never empty unless `allowEmpty`.
std::u16string nameText(Rng& rng, bool allowEmpty = true);
// Plain ASCII letters and digits.
std::u16string plainText(Rng& rng, size_t length);

// A length for an array of `arrayLength` elements: within it, at its end, one past it, far
// past it, zero, negative, or the int extremes.
jint anyLength(Rng& rng, jint arrayLength);

// Random bytes.
Bytes randomBytes(Rng& rng, size_t size);

// The bytes of toNativeString: the whole text in the ANSI code page, embedded NULs kept.
std::string ansiBytes(const std::u16string& text);
// What a C reader sees of native text: the bytes before the first NUL.
std::string cutAtNul(const std::string& bytes);
// toJavaString of NUL-terminated ANSI bytes.
std::u16string fromAnsi(const std::string& bytes);
// A Java string after toNativeString and then toJavaString.
inline std::u16string ansiRoundTrip(const std::u16string& text) {
    return fromAnsi(cutAtNul(ansiBytes(text)));
}
// Registry names compare without regard to case.
std::u16string upperCase(const std::u16string& text);

// Modified UTF-8 as GetStringUTFChars gives it.
inline std::string modifiedUtf8(const std::u16string& text) {
    return jnihost::toModifiedUtf8(text);
}
// Whether bytes are well-formed modified UTF-8 without a zero byte (what NewStringUTF may be
// given whole), and the text they stand for.
bool isModifiedUtf8(const uint8_t* bytes, size_t size, std::u16string* text = nullptr);

// For messages: the text as UTF-8, long ones cut, with their length.
std::string show(const std::u16string& text);
std::string showBytes(const Bytes& bytes);

}  // namespace fuzz
