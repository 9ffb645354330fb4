// WinRegistry reads: one value, or all values of a key into a java/util/Hashtable.
#include "com_velmor_coreutil_io_WinRegistry.h"
#include "registry/registry_values.h"

extern "C" {

jobject JNICALL Java_com_velmor_coreutil_io_WinRegistry_nativeGetRegistryValue(JNIEnv* env, jclass,
                                                                               jint rootKey, jstring keyPath,
                                                                               jstring valueName) {
    RegistryKey key;
    if (!openRegistryKey(env, rootKey, keyPath, KEY_READ, &key)) {
        return nullptr;
    }
    jobject value;
    {
        NativeText name;
        if (valueName != nullptr && !toNativeTextOrRaise(env, valueName, &name)) {
            return nullptr;
        }
        value = readRegistryValue(env, key.get(), name.get());
    }
    if (exceptionPending(env)) {
        return nullptr;
    }
    return value;
}

jobject JNICALL Java_com_velmor_coreutil_io_WinRegistry_nativeGetRegistryValues(JNIEnv* env, jclass,
                                                                                jint rootKey,
                                                                                jstring keyPath) {
    RegistryKey key;
    if (!openRegistryKey(env, rootKey, keyPath, KEY_READ, &key)) {
        return nullptr;
    }
    jclass tableClass = env->FindClass("java/util/Hashtable");
    if (tableClass == nullptr) {
        replaceWithCoreUtilException(env, "Unable to find Hashtable class.");
        return nullptr;
    }
    // The second lookup only when the first succeeded: a failed one leaves its error pending.
    jmethodID constructor = env->GetMethodID(tableClass, "<init>", "()V");
    jmethodID put =
        constructor == nullptr
            ? nullptr
            : env->GetMethodID(tableClass, "put", "(Ljava/lang/Object;Ljava/lang/Object;)Ljava/lang/Object;");
    if (put == nullptr) {
        replaceWithCoreUtilException(env, "Unable to get function IDs for Hashtable.");
        return nullptr;
    }
    jobject table = env->NewObject(tableClass, constructor);
    if (table == nullptr) {
        replaceWithCoreUtilException(env, "Unable to create new Hashtable object.");
        return nullptr;
    }

    // Names of up to 255 characters fit; a longer one (or any enumeration error) ends the
    // walk like the end of the values, and the table holds what was read before it.
    char name[256];
    for (DWORD index = 0;;) {
        DWORD capacity = sizeof name;
        if (RegEnumValueA(key.get(), index, name, &capacity, nullptr, nullptr, nullptr, nullptr) !=
            ERROR_SUCCESS) {
            break;
        }
        ++index;
        jobject value = readRegistryValue(env, key.get(), name);
        if (exceptionPending(env)) {
            return nullptr;
        }
        jstring javaName = toJavaString(env, name);
        if (javaName == nullptr) {
            raiseUnlessPending(env, "Out of memory");
            return nullptr;
        }
        env->CallObjectMethod(table, put, javaName, value);
        if (exceptionPending(env)) {
            return nullptr;  // put threw: no further JNI call may follow
        }
    }
    return table;
}

}  // extern "C"
