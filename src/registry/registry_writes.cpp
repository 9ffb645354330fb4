// WinRegistry writes: one value, or every entry of a java/util/Hashtable, creating the key
// and any missing keys along its path.
#include "com_velmor_coreutil_io_WinRegistry.h"
#include "registry/registry_values.h"

namespace {

const char kSetValueFailed[] = "Unable to set registry value.  Error in RegSetValueEx() call.";

// The Java side of a table walk: its key enumeration and the methods that step through it.
struct TableWalk {
    jobject enumeration;
    jmethodID hasMoreElements;
    jmethodID nextElement;
    jmethodID get;
};

// A failed lookup leaves the virtual machine's error pending; the caller gets the fixed
// message instead.
bool lookupFailed(JNIEnv* env, const char* message) {
    replaceWithCoreUtilException(env, message);
    return false;
}

// Looks up what the walk needs, each lookup tested as it is made, and asks the table for
// its keys. False with a CoreUtilException pending at the first failure.
bool startTableWalk(JNIEnv* env, jobject table, TableWalk* walk) {
    jclass tableClass = env->FindClass("java/util/Hashtable");
    if (tableClass == nullptr) {
        return lookupFailed(env, "Unable to find Hashtable class.");
    }
    jclass enumerationClass = env->FindClass("java/util/Enumeration");
    if (enumerationClass == nullptr) {
        return lookupFailed(env, "Unable to find Enumeration class.");
    }
    jmethodID keys = env->GetMethodID(tableClass, "keys", "()Ljava/util/Enumeration;");
    if (keys == nullptr) {
        return lookupFailed(env, "Unable to get Hashtable.keys() function.");
    }
    walk->hasMoreElements = env->GetMethodID(enumerationClass, "hasMoreElements", "()Z");
    if (walk->hasMoreElements == nullptr) {
        return lookupFailed(env, "Unable to get Enumeration.hasMoreElements() function");
    }
    walk->nextElement = env->GetMethodID(enumerationClass, "nextElement", "()Ljava/lang/Object;");
    if (walk->nextElement == nullptr) {
        return lookupFailed(env, "Unable to get Enumeration.nextElement() function.");
    }
    walk->get = env->GetMethodID(tableClass, "get", "(Ljava/lang/Object;)Ljava/lang/Object;");
    if (walk->get == nullptr) {
        return lookupFailed(env, "Unable to get Hashtable.get() function");
    }
    walk->enumeration = env->CallObjectMethod(table, keys);
    if (walk->enumeration == nullptr) {
        return lookupFailed(env, "Unable to enumerate hashtable keys.");
    }
    return true;
}

// Writes the entries in the order the enumeration hands them out, until the first failure;
// what was written before it stays.
void writeTableEntries(JNIEnv* env, HKEY key, jobject table, const TableWalk& walk) {
    for (;;) {
        // Every Java call may throw; nothing but the test may follow a pending exception.
        const jboolean more = env->CallBooleanMethod(walk.enumeration, walk.hasMoreElements);
        if (exceptionPending(env) || !more) {
            return;
        }
        jobject name = env->CallObjectMethod(walk.enumeration, walk.nextElement);
        if (exceptionPending(env)) {
            return;
        }
        if (name == nullptr || registryTypeOf(env, name) != REG_SZ) {
            raiseUnlessPending(env, "Non-String key in hashtable.");
            return;
        }
        jobject value = env->CallObjectMethod(table, walk.get, name);
        if (exceptionPending(env)) {
            return;
        }
        if (value == nullptr) {
            // Only a table that breaks Hashtable's contract gives this; storing needs an object.
            raiseCoreUtilException(env, "Cannot set registry value to null object");
            return;
        }
        if (writeRegistryValue(env, key, static_cast<jstring>(name), value) != ERROR_SUCCESS) {
            raiseCoreUtilException(env, kSetValueFailed);
            return;
        }
        if (exceptionPending(env)) {
            return;  // a value that cannot be stored ends the walk
        }
    }
}

// What both writes check and open before any value is written: the value or table first,
// then the path, both before any key is created. False with a CoreUtilException pending.
bool createKeyForWrite(JNIEnv* env, jint rootKey, jstring keyPath, jobject value, RegistryKey* key) {
    if (value == nullptr) {
        raiseCoreUtilException(env, "Cannot set registry value to null object");
        return false;
    }
    if (keyPath == nullptr) {
        raiseCoreUtilException(env, "Cannot work with null key");
        return false;
    }
    if (createRegistryKey(env, rootKey, keyPath, key) != ERROR_SUCCESS) {
        raiseUnlessPending(env, "Unable to create/open registry key");
        return false;
    }
    return true;
}

}  // namespace

extern "C" {

void JNICALL Java_com_velmor_coreutil_io_WinRegistry_nativeSetRegistryValue(JNIEnv* env, jclass, jint rootKey,
                                                                            jstring keyPath,
                                                                            jstring valueName,
                                                                            jobject value) {
    RegistryKey key;
    if (!createKeyForWrite(env, rootKey, keyPath, value, &key)) {
        return;
    }
    // An object that cannot be stored comes back as ERROR_SUCCESS with its exception pending,
    // which then reaches Java as it is.
    if (writeRegistryValue(env, key.get(), valueName, value) != ERROR_SUCCESS) {
        raiseCoreUtilException(env, kSetValueFailed);
    }
}

void JNICALL Java_com_velmor_coreutil_io_WinRegistry_nativeSetRegistryValues(JNIEnv* env, jclass,
                                                                             jint rootKey, jstring keyPath,
                                                                             jobject values) {
    RegistryKey key;
    if (!createKeyForWrite(env, rootKey, keyPath, values, &key)) {
        return;
    }
    TableWalk walk{};
    if (!startTableWalk(env, values, &walk)) {
        return;
    }
    writeTableEntries(env, key.get(), values, walk);
}

}  // extern "C"
