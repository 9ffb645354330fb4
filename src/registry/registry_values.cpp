// Value conversion and key helpers of the WinRegistry family.
#include "registry/registry_values.h"

#include <cstdint>
#include <cstring>

const char exceptionClassName[] = "com/velmor/coreutil/exception/CoreUtilException";

namespace {

const char kStringClass[] = "java/lang/String";
const char kIntegerClass[] = "java/lang/Integer";
const char kByteArrayClass[] = "[B";

// Byte-array elements taken with GetByteArrayElements only to be read, released with
// JNI_ABORT when the guard goes out of scope: nothing to copy back, and a copy back could
// overwrite what another thread wrote into the array meanwhile.
struct PinnedBytes {
    JNIEnv* env;
    jbyteArray array;
    jbyte* elements;

    ~PinnedBytes() {
        if (elements != nullptr) {
            env->ReleaseByteArrayElements(array, elements, JNI_ABORT);
        }
    }
};

}  // namespace

void raiseCoreUtilException(JNIEnv* env, const char* message) {
    // Looked up at every raise; a missing class leaves its NoClassDefFoundError pending,
    // and ThrowNew must never get a null class.
    jclass exceptionClass = env->FindClass(exceptionClassName);
    if (exceptionClass == nullptr) {
        return;
    }
    env->ThrowNew(exceptionClass, message);
}

void replaceWithCoreUtilException(JNIEnv* env, const char* message) {
    env->ExceptionClear();
    raiseCoreUtilException(env, message);
}

void raiseUnlessPending(JNIEnv* env, const char* message) {
    if (!exceptionPending(env)) {
        raiseCoreUtilException(env, message);
    }
}

bool exceptionPending(JNIEnv* env) {
    return env->ExceptionOccurred() != nullptr;
}

bool toNativeTextOrRaise(JNIEnv* env, jstring text, NativeText* result, size_t* byteCount) {
    result->reset(toNativeString(env, text, byteCount));
    if (*result) {
        return true;
    }
    // Null either from GetStringChars (its error is pending) or from calloc (nothing is).
    raiseUnlessPending(env, "Out of memory");
    return false;
}

bool openRegistryKey(JNIEnv* env, jint rootKey, jstring keyPath, REGSAM access, RegistryKey* key) {
    if (keyPath == nullptr) {
        raiseCoreUtilException(env, "Cannot work with null registry key");
        return false;
    }
    HKEY opened = nullptr;
    LONG result;
    {
        NativeText path;
        if (!toNativeTextOrRaise(env, keyPath, &path)) {
            return false;
        }
        result = RegOpenKeyExA(rootKeyOf(rootKey), path.get(), 0, access, &opened);
    }
    if (result != ERROR_SUCCESS) {
        raiseCoreUtilException(env, "Unable to open registry key");
        return false;
    }
    key->reset(opened);
    return true;
}

DWORD registryTypeOf(JNIEnv* env, jobject object) {
    // Each lookup is tested as it is made: after a failed one, no further JNI call may come.
    jclass stringClass = env->FindClass(kStringClass);
    if (stringClass == nullptr) {
        return REG_NONE;
    }
    jclass integerClass = env->FindClass(kIntegerClass);
    if (integerClass == nullptr) {
        return REG_NONE;
    }
    jclass byteArrayClass = env->FindClass(kByteArrayClass);
    if (byteArrayClass == nullptr) {
        return REG_NONE;
    }
    jclass objectClass = env->GetObjectClass(object);
    if (env->IsAssignableFrom(objectClass, stringClass)) {
        return REG_SZ;
    }
    if (env->IsAssignableFrom(objectClass, integerClass)) {
        return REG_DWORD;
    }
    if (env->IsAssignableFrom(objectClass, byteArrayClass)) {
        return REG_BINARY;
    }
    return REG_NONE;
}

LONG createRegistryKey(JNIEnv* env, jint rootKey, jstring keyPath, RegistryKey* key) {
    NativeText path;
    if (!toNativeTextOrRaise(env, keyPath, &path)) {
        return ERROR_NOT_ENOUGH_MEMORY;
    }
    HKEY opened = nullptr;
    DWORD disposition = 0;  // created or merely opened: both serve
    const LONG result = RegCreateKeyExA(rootKeyOf(rootKey), path.get(), 0, nullptr, REG_OPTION_NON_VOLATILE,
                                        KEY_ALL_ACCESS, nullptr, &opened, &disposition);
    if (result == ERROR_SUCCESS) {
        key->reset(opened);
    }
    return result;
}

LONG writeRegistryValue(JNIEnv* env, HKEY key, jstring valueName, jobject value) {
    NativeText name;
    if (valueName != nullptr && !toNativeTextOrRaise(env, valueName, &name)) {
        return ERROR_SUCCESS;
    }
    const DWORD type = registryTypeOf(env, value);
    if (exceptionPending(env)) {
        return ERROR_SUCCESS;
    }

    NativeText text;
    jint number = 0;
    PinnedBytes bytes{env, nullptr, nullptr};
    const BYTE* data = nullptr;
    DWORD size = 0;
    switch (type) {
        case REG_SZ: {
            size_t bytes = 0;
            if (!toNativeTextOrRaise(env, static_cast<jstring>(value), &text, &bytes)) {
                return ERROR_SUCCESS;
            }
            // The converted bytes plus the terminator. The Java string's length is not the
            // size: under a double-byte code page one character takes two bytes, and a
            // surrogate pair becomes one default character, so that length would cut the
            // text short or read past the block.
            data = reinterpret_cast<const BYTE*>(text.get());
            size = static_cast<DWORD>(bytes + 1);
            break;
        }
        case REG_DWORD: {
            jclass integerClass = env->FindClass(kIntegerClass);
            if (integerClass == nullptr) {
                return ERROR_SUCCESS;
            }
            jmethodID intValue = env->GetMethodID(integerClass, "intValue", "()I");
            if (intValue == nullptr) {
                return ERROR_SUCCESS;
            }
            number = env->CallIntMethod(value, intValue);
            data = reinterpret_cast<const BYTE*>(&number);  // little-endian, as REG_DWORD is
            size = sizeof number;
            break;
        }
        case REG_BINARY: {
            bytes.array = static_cast<jbyteArray>(value);
            bytes.elements = env->GetByteArrayElements(bytes.array, nullptr);
            if (bytes.elements == nullptr) {
                return ERROR_SUCCESS;
            }
            data = reinterpret_cast<const BYTE*>(bytes.elements);
            size = static_cast<DWORD>(env->GetArrayLength(bytes.array));
            break;
        }
        default:
            raiseCoreUtilException(env, "Unable to determine type for registry value");
            return ERROR_SUCCESS;
    }
    return RegSetValueExA(key, name.get(), 0, type, data, size);
}

jobject readRegistryValue(JNIEnv* env, HKEY key, const char* valueName) {
    DWORD type = REG_NONE;
    DWORD size = 0;
    if (RegQueryValueExA(key, valueName, nullptr, &type, nullptr, &size) != ERROR_SUCCESS) {
        raiseCoreUtilException(env, "RegQueryValueEx() call failed");
        return nullptr;
    }
    // One byte beyond the size offered to Windows holds a terminator, so REG_SZ data stored
    // without its NUL still ends inside the block; an empty value still gets a valid block.
    HeapBlock<BYTE> buffer(size < MAXDWORD ? static_cast<BYTE*>(std::malloc(size_t{size} + 1)) : nullptr);
    if (!buffer) {
        raiseCoreUtilException(env, "Out of memory");
        return nullptr;
    }
    // No second attempt: a value that grew since the probe fails here.
    if (RegQueryValueExA(key, valueName, nullptr, &type, buffer.get(), &size) != ERROR_SUCCESS) {
        raiseCoreUtilException(env, "RegQueryValueEx() call failed");
        return nullptr;
    }
    buffer.get()[size] = 0;

    switch (type) {
        case REG_SZ: {
            jstring text = toJavaString(env, reinterpret_cast<const char*>(buffer.get()));
            if (text == nullptr) {
                raiseUnlessPending(env, "Out of memory");
            }
            return text;
        }
        case REG_DWORD: {
            if (size < sizeof(int32_t)) {
                break;  // too short to be a number: never read past the bytes returned
            }
            int32_t number;
            std::memcpy(&number, buffer.get(), sizeof number);
            jclass integerClass = env->FindClass(kIntegerClass);
            if (integerClass == nullptr) {
                return nullptr;
            }
            jmethodID constructor = env->GetMethodID(integerClass, "<init>", "(I)V");
            if (constructor == nullptr) {
                return nullptr;
            }
            return env->NewObject(integerClass, constructor, static_cast<jint>(number));
        }
        case REG_BINARY: {
            jbyteArray array = env->NewByteArray(static_cast<jsize>(size));
            if (array == nullptr) {
                return nullptr;
            }
            env->SetByteArrayRegion(array, 0, static_cast<jsize>(size),
                                    reinterpret_cast<const jbyte*>(buffer.get()));
            return array;
        }
        default:
            break;
    }
    raiseCoreUtilException(env, "Unable to convert MS registry value to java");
    return nullptr;
}
