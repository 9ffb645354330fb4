// JNI functions: calls of Java methods, and exceptions.
#include <cstdarg>
#include <cstdio>

#include "jni_call.h"

namespace jnihost {
namespace {

// ---- Methods ----

template <class R>
R as(const jvalue& v) {
    if constexpr (std::is_same_v<R, jobject>) {
        return v.l;
    } else if constexpr (std::is_same_v<R, jboolean>) {
        return v.z;
    } else if constexpr (std::is_same_v<R, jint>) {
        return v.i;
    }
}

jvalue callMethod(Call& c, jobject obj, jmethodID id, char kind, const jvalue* a, va_list* ap) {
    Obj* o = c.obj(obj, "object");
    const Member* m = c.member(id, false);
    std::vector<jvalue> args;
    if (!o || !m)
        return jvalue{};
    if (m->name == "<init>") {
        c.fail("calls constructor " + memberName(m));
    } else if (kindOf(m->sig.substr(m->sig.find(')') + 1)) != kind) {
        c.fail(memberName(m) + " does not return " + (kind == 'L' ? "an object" : std::string(1, kind)));
    } else if (!c.vm().isA(o->cls, m->owner)) {
        c.fail(memberName(m) + " called on " + c.vm().describe(o));
    } else if (c.args(m, a, ap, args)) {
        Ctx ctx = c.ctx();
        return m->impl(ctx, o, args.data());
    }
    return jvalue{};
}

#define CALL_METHODS(Type, R, kind)                                                             \
    R JNICALL Call##Type##Method(JNIEnv* env, jobject obj, jmethodID id, ...) {                 \
        ENTER(R, Call##Type##Method);                                                           \
        va_list ap;                                                                             \
        va_start(ap, id);                                                                       \
        const jvalue v = callMethod(c, obj, id, kind, nullptr, &ap);                            \
        va_end(ap);                                                                             \
        return as<R>(v);                                                                        \
    }                                                                                           \
    R JNICALL Call##Type##MethodV(JNIEnv* env, jobject obj, jmethodID id, va_list args) {       \
        ENTER(R, Call##Type##MethodV);                                                          \
        va_list ap;                                                                             \
        va_copy(ap, args);                                                                      \
        const jvalue v = callMethod(c, obj, id, kind, nullptr, &ap);                            \
        va_end(ap);                                                                             \
        return as<R>(v);                                                                        \
    }                                                                                           \
    R JNICALL Call##Type##MethodA(JNIEnv* env, jobject obj, jmethodID id, const jvalue* args) { \
        ENTER(R, Call##Type##MethodA);                                                          \
        return as<R>(callMethod(c, obj, id, kind, args, nullptr));                              \
    }
CALL_METHODS(Object, jobject, 'L')
CALL_METHODS(Boolean, jboolean, 'Z')
CALL_METHODS(Int, jint, 'I')
CALL_METHODS(Void, void, 'V')

// ---- Exceptions ----

jthrowable JNICALL ExceptionOccurred(JNIEnv* env) {
    ENTER(jthrowable, ExceptionOccurred);
    return static_cast<jthrowable>(handle(c.env().pending));
}

jboolean JNICALL ExceptionCheck(JNIEnv* env) {
    ENTER(jboolean, ExceptionCheck);
    return c.env().pending != nullptr;
}

void JNICALL ExceptionClear(JNIEnv* env) {
    ENTER(void, ExceptionClear);
    c.env().pending = nullptr;
}

void JNICALL ExceptionDescribe(JNIEnv* env) {
    ENTER(void, ExceptionDescribe);
    if (c.env().pending)
        std::fprintf(stderr, "Exception: %s\n", c.vm().describe(c.env().pending).c_str());
    c.env().pending = nullptr;  // describing clears it, as in the JVM
}

jint JNICALL Throw(JNIEnv* env, jthrowable obj) {
    ENTER(jint, Throw);
    Obj* o = c.instance(obj, c.vm().cThrowable, "throwable");
    if (o)
        c.env().pending = o;
    return o ? JNI_OK : JNI_ERR;
}

jint JNICALL ThrowNew(JNIEnv* env, jclass clazz, const char* msg) {
    ENTER(jint, ThrowNew);
    ClassRec* k = c.cls(clazz);
    if (k && !c.vm().isA(k, c.vm().cThrowable))
        k = c.fail(k->name + " is not a Throwable");
    if (!k)
        return JNI_ERR;
    std::u16string text;
    if (msg && !fromModifiedUtf8(msg, text))
        c.fail("message is not modified UTF-8");
    c.vm().throwNew(c.env(), k->name, text, msg == nullptr);
    return JNI_OK;
}

}  // namespace

void fillCallSlots(JNINativeInterface_& t) {
    SLOT(CallObjectMethod), SLOT(CallObjectMethodV), SLOT(CallObjectMethodA);
    SLOT(CallBooleanMethod), SLOT(CallBooleanMethodV), SLOT(CallBooleanMethodA);
    SLOT(CallIntMethod), SLOT(CallIntMethodV), SLOT(CallIntMethodA);
    SLOT(CallVoidMethod), SLOT(CallVoidMethodV), SLOT(CallVoidMethodA);
    SLOT(ExceptionOccurred), SLOT(ExceptionCheck), SLOT(ExceptionClear), SLOT(ExceptionDescribe);
    SLOT(Throw), SLOT(ThrowNew);
}

}  // namespace jnihost
