#include "bridge/text_conversion.h"

#include <windows.h>

char* toNativeString(JNIEnv* env, jstring text, size_t* byteCount) {
    const jchar* units = env->GetStringChars(text, nullptr);
    if (units == nullptr) {
        return nullptr;  // out of memory: the virtual machine has its error pending
    }
    const jsize length = env->GetStringLength(text);
    const auto* wide = reinterpret_cast<const wchar_t*>(units);

    // The explicit length counts no terminator, so n is the text's own byte count; the
    // zero-filled block of n + 1 bytes is terminated before the conversion writes.
    const int n = WideCharToMultiByte(CP_ACP, 0, wide, length, nullptr, 0, nullptr, nullptr);
    char* block = static_cast<char*>(std::calloc(static_cast<size_t>(n) + 1, 1));
    if (block != nullptr) {
        WideCharToMultiByte(CP_ACP, 0, wide, length, block, n, nullptr, nullptr);
        if (byteCount != nullptr) {
            *byteCount = static_cast<size_t>(n);
        }
    }
    env->ReleaseStringChars(text, units);
    return block;
}

jstring toJavaString(JNIEnv* env, const char* text) {
    // m counts the terminator too, so a valid answer is at least 1.
    const int m = MultiByteToWideChar(CP_ACP, 0, text, -1, nullptr, 0);
    if (m < 1) {
        return nullptr;
    }
    HeapBlock<jchar> units(static_cast<jchar*>(std::calloc(static_cast<size_t>(m), sizeof(jchar))));
    if (!units) {
        return nullptr;
    }
    MultiByteToWideChar(CP_ACP, 0, text, -1, reinterpret_cast<wchar_t*>(units.get()), m);
    return env->NewString(units.get(), m - 1);
}
