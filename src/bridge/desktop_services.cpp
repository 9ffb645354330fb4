// CoreNativeNT: cursor position, environment variables and shell special folders.
// Every call looks java/awt/Point and its members up anew; a failed lookup returns at once
// with the virtual machine's error pending, so no null class or ID is ever used.
#include <windows.h>
#include <shlobj.h>

#include "bridge/shell_item_list.h"
#include "bridge/text_conversion.h"
#include "com_velmor_coreutil_corenative_CoreNativeNT.h"

namespace {

const char kPointClass[] = "java/awt/Point";

}  // namespace

extern "C" {

jobject JNICALL Java_com_velmor_coreutil_corenative_CoreNativeNT_getCursorPos(JNIEnv* env, jclass) {
    POINT position;
    if (!GetCursorPos(&position)) {
        return nullptr;
    }
    jclass pointClass = env->FindClass(kPointClass);
    if (pointClass == nullptr) {
        return nullptr;
    }
    jmethodID constructor = env->GetMethodID(pointClass, "<init>", "(II)V");
    if (constructor == nullptr) {
        return nullptr;
    }
    return env->NewObject(pointClass, constructor, static_cast<jint>(position.x),
                          static_cast<jint>(position.y));
}

jboolean JNICALL Java_com_velmor_coreutil_corenative_CoreNativeNT_setCursorPos(JNIEnv* env, jclass,
                                                                               jobject point) {
    if (point == nullptr) {
        return JNI_FALSE;
    }
    // The class found by name, not the argument's class, so subclasses of Point work too.
    jclass pointClass = env->FindClass(kPointClass);
    if (pointClass == nullptr) {
        return JNI_FALSE;
    }
    jfieldID xField = env->GetFieldID(pointClass, "x", "I");
    if (xField == nullptr) {
        return JNI_FALSE;
    }
    jfieldID yField = env->GetFieldID(pointClass, "y", "I");
    if (yField == nullptr) {
        return JNI_FALSE;
    }
    const jint x = env->GetIntField(point, xField);
    const jint y = env->GetIntField(point, yField);
    return SetCursorPos(x, y) ? JNI_TRUE : JNI_FALSE;
}

jstring JNICALL Java_com_velmor_coreutil_corenative_CoreNativeNT_getEnvVariable(JNIEnv* env, jclass,
                                                                                jstring name) {
    if (name == nullptr) {
        return nullptr;
    }
    NativeText nativeName(toNativeString(env, name));
    if (!nativeName) {
        return nullptr;
    }
    // The size includes the terminator; 0 means the variable is not defined.
    const DWORD size = GetEnvironmentVariableA(nativeName.get(), nullptr, 0);
    if (size == 0) {
        return nullptr;
    }
    NativeText value(static_cast<char*>(std::calloc(1, static_cast<size_t>(size) + 1)));
    if (!value) {
        return nullptr;
    }
    GetEnvironmentVariableA(nativeName.get(), value.get(), size);
    nativeName.reset();
    return toJavaString(env, value.get());
}

jstring JNICALL Java_com_velmor_coreutil_corenative_CoreNativeNT_getSpecialFolderLocation(JNIEnv* env, jclass,
                                                                                          jint folderId) {
    char path[MAX_PATH] = {};
    BOOL found = FALSE;
    {
        ITEMIDLIST* raw = nullptr;
        if (FAILED(SHGetSpecialFolderLocation(nullptr, folderId, &raw)) || raw == nullptr) {
            return nullptr;
        }
        ItemList list(raw);
        found = SHGetPathFromIDListA(list.get(), path);
    }  // the item list goes back to the shell before the Java string is made
    return found ? toJavaString(env, path) : nullptr;
}

}  // extern "C"
