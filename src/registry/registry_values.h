// What the WinRegistry exports share: Java objects to and from typed registry values, the
// key created for writing, and raising CoreUtilException. Every failure reaches Java as a
// CoreUtilException with a fixed message, at most one per native call.
#pragma once

#include <windows.h>

#include <jni.h>

#include <memory>
#include <type_traits>

#include "bridge/text_conversion.h"

extern const char exceptionClassName[];

// Closes an open registry key when it goes out of scope.
struct RegistryKeyCloser {
    void operator()(HKEY key) const { RegCloseKey(key); }
};
using RegistryKey = std::unique_ptr<std::remove_pointer_t<HKEY>, RegistryKeyCloser>;

// The Java int is the predefined key's handle value itself; no table maps it.
inline HKEY rootKeyOf(jint rootKey) {
    return reinterpret_cast<HKEY>(static_cast<LONG_PTR>(rootKey));
}

// Throws a CoreUtilException with the message. No exception may be pending; when the class
// itself cannot be found, the virtual machine's own error is left pending instead.
void raiseCoreUtilException(JNIEnv* env, const char* message);

// For a failed Java-side lookup: the virtual machine's error is cleared first, because no
// JNI call may follow it, and the caller is promised the fixed message.
void replaceWithCoreUtilException(JNIEnv* env, const char* message);

// Raises only when nothing is pending yet, for failures that may or may not have come with
// the virtual machine's own error (out of memory, a routine that raised already).
void raiseUnlessPending(JNIEnv* env, const char* message);

bool exceptionPending(JNIEnv* env);

// Converts a Java string (never null) to native text, and its byte count without the
// terminator when asked. On failure raises "Out of memory" unless the virtual machine
// already has its error pending, and returns false.
bool toNativeTextOrRaise(JNIEnv* env, jstring text, NativeText* result, size_t* byteCount = nullptr);

// REG_SZ, REG_DWORD, REG_BINARY or REG_NONE (cannot be stored) for a non-null object.
// REG_NONE with the virtual machine's error pending when a class lookup failed.
DWORD registryTypeOf(JNIEnv* env, jobject object);

// Creates or opens rootKey\keyPath (keyPath never null) with every missing key along it.
// On ERROR_SUCCESS *key holds the open key. A failed path conversion returns
// ERROR_NOT_ENOUGH_MEMORY with an exception already pending.
LONG createRegistryKey(JNIEnv* env, jint rootKey, jstring keyPath, RegistryKey* key);

// Opens rootKey\keyPath with the given access for a read or a delete. A null path raises
// "Cannot work with null registry key", a failed open "Unable to open registry key"; the
// path text is freed before either. False with the exception pending.
bool openRegistryKey(JNIEnv* env, jint rootKey, jstring keyPath, REGSAM access, RegistryKey* key);

// Stores a non-null object under the name (null: the default value). Returns the result of
// RegSetValueExA, or ERROR_SUCCESS with an exception pending when the object cannot be
// stored or a conversion failed, so callers test for a pending exception too.
LONG writeRegistryValue(JNIEnv* env, HKEY key, jstring valueName, jobject value);

// Reads the named value (null: the default value) as a Java string, java/lang/Integer or
// byte array; null with an exception pending on any failure.
jobject readRegistryValue(JNIEnv* env, HKEY key, const char* valueName);
