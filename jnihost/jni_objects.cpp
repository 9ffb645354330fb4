// JNI functions: making objects, their fields, and local references.
#include <cstdarg>

#include "jni_call.h"

namespace jnihost {
namespace {

// ---- Objects ----

jobject newObject(Call& c, jclass clazz, jmethodID ctor, const jvalue* a, va_list* ap) {
    ClassRec* k = c.cls(clazz);
    const Member* m = c.member(ctor, false);
    std::vector<jvalue> args;
    if (!k || !m)
        return nullptr;
    if (m->name != "<init>" || m->owner != k)
        return c.fail(memberName(m) + " is not a constructor of " + k->name);
    if (!c.args(m, a, ap, args) || c.injectedOom(k))
        return nullptr;
    Obj* o = c.vm().make(k);
    Ctx ctx = c.ctx();
    m->impl(ctx, o, args.data());
    return handle(o);
}

jobject JNICALL NewObject(JNIEnv* env, jclass clazz, jmethodID ctor, ...) {
    ENTER(jobject, NewObject);
    va_list ap;
    va_start(ap, ctor);
    const jobject r = newObject(c, clazz, ctor, nullptr, &ap);
    va_end(ap);
    return r;
}

jobject JNICALL NewObjectV(JNIEnv* env, jclass clazz, jmethodID ctor, va_list args) {
    ENTER(jobject, NewObjectV);
    va_list ap;
    va_copy(ap, args);
    const jobject r = newObject(c, clazz, ctor, nullptr, &ap);
    va_end(ap);
    return r;
}

jobject JNICALL NewObjectA(JNIEnv* env, jclass clazz, jmethodID ctor, const jvalue* args) {
    ENTER(jobject, NewObjectA);
    return newObject(c, clazz, ctor, args, nullptr);
}

jobject JNICALL AllocObject(JNIEnv* env, jclass clazz) {
    ENTER(jobject, AllocObject);
    ClassRec* k = c.cls(clazz);
    if (k && (k->isInterface || k->name[0] == '['))
        return c.fail(k->name + " cannot be instantiated");
    return k && !c.injectedOom(k) ? handle(c.vm().make(k)) : nullptr;
}

// ---- Fields ----

// The field's slot in `obj`, when the ID is a field of obj's class of the given kind.
jvalue* fieldOf(Call& c, jobject obj, jfieldID id, char kind) {
    Obj* o = c.obj(obj, "object");
    const Member* f = c.member(id, true);
    if (!o || !f)
        return nullptr;
    if (kindOf(f->sig) != kind)
        return c.fail("field " + memberName(f) + " is not of type " + kind);
    if (!c.vm().isA(o->cls, f->owner))
        return c.fail("field " + memberName(f) + " used on " + c.vm().describe(o));
    return &o->fields[f];
}

#define FIELD_ACCESSORS(Type, R, kind, member)                                      \
    R JNICALL Get##Type##Field(JNIEnv* env, jobject obj, jfieldID id) {             \
        ENTER(R, Get##Type##Field);                                                 \
        const jvalue* v = fieldOf(c, obj, id, kind);                                \
        return v ? v->member : R();                                                 \
    }                                                                               \
    void JNICALL Set##Type##Field(JNIEnv* env, jobject obj, jfieldID id, R value) { \
        ENTER(void, Set##Type##Field);                                              \
        if (jvalue* v = fieldOf(c, obj, id, kind))                                  \
            v->member = value;                                                      \
    }
FIELD_ACCESSORS(Int, jint, 'I', i)
FIELD_ACCESSORS(Long, jlong, 'J', j)
FIELD_ACCESSORS(Boolean, jboolean, 'Z', z)

jobject JNICALL GetObjectField(JNIEnv* env, jobject obj, jfieldID id) {
    ENTER(jobject, GetObjectField);
    const jvalue* v = fieldOf(c, obj, id, 'L');
    return v ? v->l : nullptr;
}

void JNICALL SetObjectField(JNIEnv* env, jobject obj, jfieldID id, jobject value) {
    ENTER(void, SetObjectField);
    jvalue* v = fieldOf(c, obj, id, 'L');
    Obj* o;
    if (!v || !c.optObj(value, "value", o))
        return;
    const Member* f = static_cast<const Member*>(static_cast<void*>(id));
    const ClassRec* want = c.vm().classOfType(f->sig);
    if (o && want && !c.vm().isA(o->cls, want)) {
        c.fail("value " + c.vm().describe(o) + " stored in field " + memberName(f));
    } else {
        v->l = value;
    }
}

// ---- References ----
// Objects live as long as the Vm, so a local reference is the object's handle itself.

void JNICALL DeleteLocalRef(JNIEnv* env, jobject obj) {
    ENTER(void, DeleteLocalRef);
    Obj* o;
    c.optObj(obj, "reference", o);
}

jobject JNICALL NewLocalRef(JNIEnv* env, jobject ref) {
    ENTER(jobject, NewLocalRef);
    Obj* o;
    return c.optObj(ref, "reference", o) ? ref : nullptr;
}

jint JNICALL EnsureLocalCapacity(JNIEnv* env, jint capacity) {
    ENTER(jint, EnsureLocalCapacity);
    if (capacity < 0)
        c.fail("negative capacity");
    return capacity < 0 ? JNI_ERR : JNI_OK;
}

jint JNICALL PushLocalFrame(JNIEnv* env, jint capacity) {
    ENTER(jint, PushLocalFrame);
    if (capacity < 0)
        c.fail("negative capacity");
    return capacity < 0 ? JNI_ERR : JNI_OK;
}

jobject JNICALL PopLocalFrame(JNIEnv* env, jobject result) {
    ENTER(jobject, PopLocalFrame);
    Obj* o;
    return c.optObj(result, "result", o) ? result : nullptr;
}

}  // namespace

void fillObjectSlots(JNINativeInterface_& t) {
    SLOT(NewObject), SLOT(NewObjectV), SLOT(NewObjectA), SLOT(AllocObject);
    SLOT(GetIntField), SLOT(SetIntField), SLOT(GetLongField), SLOT(SetLongField);
    SLOT(GetBooleanField), SLOT(SetBooleanField), SLOT(GetObjectField), SLOT(SetObjectField);
    SLOT(DeleteLocalRef), SLOT(NewLocalRef), SLOT(EnsureLocalCapacity);
    SLOT(PushLocalFrame), SLOT(PopLocalFrame);
}

}  // namespace jnihost
