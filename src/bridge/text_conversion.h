// Text between Java strings (UTF-16) and Windows ANSI text in the process's code page.
#pragma once

#include <jni.h>

#include <cstdlib>
#include <memory>

// Releases a block of the C runtime heap (calloc/malloc) when it goes out of scope.
struct FreeDeleter {
    void operator()(void* block) const { std::free(block); }
};
template <class T>
using HeapBlock = std::unique_ptr<T, FreeDeleter>;

// Native text: NUL-terminated ANSI bytes in a calloc block that the receiver frees.
using NativeText = HeapBlock<char>;

// Converts a Java string (never null) to native text sized exactly by a first conversion
// call. Characters the code page lacks become its default character. Null when the block
// cannot be allocated; the caller frees the result. When byteCount is given, it receives
// the text's size in bytes without the terminator (the answer of the sizing call).
char* toNativeString(JNIEnv* env, jstring text, size_t* byteCount = nullptr);

// Makes a new Java string from native text (never null). Null when no memory is left, with
// the virtual machine's error pending where it was NewString that failed.
jstring toJavaString(JNIEnv* env, const char* text);
