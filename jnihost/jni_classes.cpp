// JNI functions: the version, classes, and method and field IDs.
#include "jni_call.h"

namespace jnihost {
namespace {

jint JNICALL GetVersion(JNIEnv* env) {
    ENTER(jint, GetVersion);
    return JNI_VERSION_1_8;
}

jclass JNICALL FindClass(JNIEnv* env, const char* name) {
    ENTER(jclass, FindClass);
    if (!name)
        return c.fail("null class name");
    ClassRec* k = c.vm().failClass.count(name) ? nullptr : c.vm().findClass(name);
    if (!k)
        c.throwNew("java/lang/NoClassDefFoundError", name);
    return k ? static_cast<jclass>(handle(k->mirror)) : nullptr;
}

jclass JNICALL GetSuperclass(JNIEnv* env, jclass sub) {
    ENTER(jclass, GetSuperclass);
    ClassRec* k = c.cls(sub);
    return k && k->super && !k->isInterface ? static_cast<jclass>(handle(k->super->mirror)) : nullptr;
}

jboolean JNICALL IsAssignableFrom(JNIEnv* env, jclass sub, jclass sup) {
    ENTER(jboolean, IsAssignableFrom);
    ClassRec* a = c.cls(sub, "first class");
    ClassRec* b = c.cls(sup, "second class");
    return c.vm().isA(a, b);
}

jclass JNICALL GetObjectClass(JNIEnv* env, jobject obj) {
    ENTER(jclass, GetObjectClass);
    Obj* o = c.obj(obj, "object");
    return o ? static_cast<jclass>(handle(o->cls->mirror)) : nullptr;
}

jboolean JNICALL IsInstanceOf(JNIEnv* env, jobject obj, jclass clazz) {
    ENTER(jboolean, IsInstanceOf);
    ClassRec* k = c.cls(clazz);
    Obj* o;
    return k && c.optObj(obj, "object", o) && (!o || c.vm().isA(o->cls, k));  // null is an instance of all
}

jboolean JNICALL IsSameObject(JNIEnv* env, jobject a, jobject b) {
    ENTER(jboolean, IsSameObject);
    Obj* o;
    c.optObj(a, "first object", o);
    c.optObj(b, "second object", o);
    return a == b;
}

// The host's classes have no static methods, so a static lookup always fails.
void* lookup(Call& c, jclass clazz, const char* name, const char* sig, bool field, bool isStatic) {
    ClassRec* k = c.cls(clazz);
    if (!k)
        return nullptr;
    if (!name || !sig)
        return c.fail("null member name or signature");
    const Member* m = isStatic || c.vm().failMember.count({k->name, name})
                          ? nullptr
                          : c.vm().findMember(k, name, sig, field);
    if (!m)
        c.throwNew(field ? "java/lang/NoSuchFieldError" : "java/lang/NoSuchMethodError", name);
    return const_cast<Member*>(m);
}

jmethodID JNICALL GetMethodID(JNIEnv* env, jclass clazz, const char* name, const char* sig) {
    ENTER(jmethodID, GetMethodID);
    return static_cast<jmethodID>(lookup(c, clazz, name, sig, false, false));
}

jmethodID JNICALL GetStaticMethodID(JNIEnv* env, jclass clazz, const char* name, const char* sig) {
    ENTER(jmethodID, GetStaticMethodID);
    return static_cast<jmethodID>(lookup(c, clazz, name, sig, false, true));
}

jfieldID JNICALL GetFieldID(JNIEnv* env, jclass clazz, const char* name, const char* sig) {
    ENTER(jfieldID, GetFieldID);
    return static_cast<jfieldID>(lookup(c, clazz, name, sig, true, false));
}

}  // namespace

void fillClassSlots(JNINativeInterface_& t) {
    SLOT(GetVersion), SLOT(FindClass), SLOT(GetSuperclass), SLOT(IsAssignableFrom), SLOT(GetObjectClass);
    SLOT(IsInstanceOf), SLOT(IsSameObject), SLOT(GetMethodID), SLOT(GetStaticMethodID), SLOT(GetFieldID);
}

}  // namespace jnihost
