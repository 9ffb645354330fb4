// WinRegistry deletes: one value, or a key, with its whole tree when asked.
#include "com_velmor_coreutil_io_WinRegistry.h"
#include "registry/registry_values.h"

namespace {

// True when the key opens and holds neither sub-keys nor values. A key that cannot be
// opened, or whose counts cannot be read, is not empty.
bool isKeyEmpty(HKEY parent, const char* path) {
    HKEY opened = nullptr;
    if (RegOpenKeyExA(parent, path, 0, KEY_QUERY_VALUE | KEY_ENUMERATE_SUB_KEYS, &opened) != ERROR_SUCCESS) {
        return false;
    }
    RegistryKey key(opened);
    DWORD subKeys = 0;
    DWORD values = 0;
    if (RegQueryInfoKeyA(key.get(), nullptr, nullptr, nullptr, &subKeys, nullptr, nullptr, &values, nullptr,
                         nullptr, nullptr, nullptr) != ERROR_SUCCESS) {
        return false;
    }
    return subKeys == 0 && values == 0;
}

// Deletes parent\path and everything below it, deepest keys first; false at the first
// failure, leaving what was not yet deleted in place.
bool deleteKeyTree(HKEY parent, const char* path) {
    if (isKeyEmpty(parent, path)) {
        return RegDeleteKeyA(parent, path) == ERROR_SUCCESS;
    }
    HKEY opened = nullptr;
    if (RegOpenKeyExA(parent, path, 0, DELETE | KEY_ENUMERATE_SUB_KEYS, &opened) != ERROR_SUCCESS) {
        return false;
    }
    RegistryKey key(opened);
    // Key names have at most 255 characters, so each fits with its terminator.
    char name[256];
    for (;;) {
        DWORD capacity = sizeof name;
        // Always index 0: the sub-key just deleted is gone, so the next one moves up.
        const LONG result = RegEnumKeyExA(key.get(), 0, name, &capacity, nullptr, nullptr, nullptr, nullptr);
        if (result == ERROR_NO_MORE_ITEMS) {
            // Its values go with it; the handle still open is closed right after.
            return RegDeleteKeyA(parent, path) == ERROR_SUCCESS;
        }
        if (result != ERROR_SUCCESS || !deleteKeyTree(key.get(), name)) {
            return false;
        }
    }
}

}  // namespace

extern "C" {

void JNICALL Java_com_velmor_coreutil_io_WinRegistry_nativeDeleteRegistryValue(JNIEnv* env, jclass,
                                                                               jint rootKey, jstring keyPath,
                                                                               jstring valueName) {
    RegistryKey key;
    if (!openRegistryKey(env, rootKey, keyPath, KEY_WRITE, &key)) {
        return;
    }
    LONG result;
    {
        NativeText name;
        if (valueName != nullptr && !toNativeTextOrRaise(env, valueName, &name)) {
            return;
        }
        result = RegDeleteValueA(key.get(), name.get());
    }
    if (result != ERROR_SUCCESS) {
        raiseCoreUtilException(env, "Unable to delete registry value");
    }
}

void JNICALL Java_com_velmor_coreutil_io_WinRegistry_nativeDeleteRegistryKey(JNIEnv* env, jclass,
                                                                             jint rootKey, jstring keyPath,
                                                                             jboolean recursive) {
    if (keyPath == nullptr) {
        raiseCoreUtilException(env, "Cannot work with null registry key");
        return;
    }
    NativeText path;
    if (!toNativeTextOrRaise(env, keyPath, &path)) {
        return;
    }
    // An empty path names the root itself, which is never deleted.
    if (path.get()[0] == '\0') {
        raiseCoreUtilException(env, "Invalid registry key");
        return;
    }
    const HKEY root = rootKeyOf(rootKey);
    if (isKeyEmpty(root, path.get())) {
        if (RegDeleteKeyA(root, path.get()) != ERROR_SUCCESS) {
            raiseCoreUtilException(env, "Error in call to RegDeleteKey()");
        }
        return;
    }
    if (!recursive) {
        raiseCoreUtilException(env, "Unable to remove non-empty key");
        return;
    }
    if (!deleteKeyTree(root, path.get())) {
        raiseCoreUtilException(env, "Unable to delete one or more recursive keys");
    }
}

}  // extern "C"
