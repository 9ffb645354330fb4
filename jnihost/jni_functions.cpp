// The JNIEnv function table. Every function first checks the env (ours, its own thread, no
// exception pending unless JNI allows the function then), then its arguments, and reports
// each broken rule under its own name. Where the call can still be carried out safely it
// is, so that a test goes on and shows what follows.
#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <utility>

#include "vm_state.h"

namespace jnihost {
namespace {

bool allowedWhilePending(std::string_view n) {
    for (std::string_view a :
         {"ExceptionOccurred", "ExceptionCheck", "ExceptionClear", "ExceptionDescribe", "DeleteLocalRef",
          "DeleteGlobalRef", "PopLocalFrame", "PushLocalFrame", "EnsureLocalCapacity"}) {
        if (n == a)
            return true;
    }
    return n.substr(0, 7) == "Release";  // Release*Chars, Release*ArrayElements, Release*Critical
}

std::string memberName(const Member* m) {
    return m->owner->name + "." + m->name + m->sig;
}
char kindOf(const std::string& type) {
    return type[0] == '[' ? 'L' : type[0];
}

// One JNI function call in progress: holds the Vm lock, validates, reports.
class Call {
public:
    Call(JNIEnv* e, int slot) : name_(kSlotNames[slot]), env_(lookupEnv(e)) {
        if (!env_) {
            reportUnknownEnv(e, name_);
            return;
        }
        vm_ = env_->vm;
        lock_ = std::unique_lock<std::recursive_mutex>(vm_->mu);
        ++vm_->counts[slot];
        if (env_->thread != currentThreadId()) {
            fail("JNIEnv of thread " + std::to_string(env_->thread) + " used on thread " +
                 std::to_string(currentThreadId()));
        }
        if (env_->pending && !allowedWhilePending(name_)) {
            fail("called with an exception pending (" + vm_->describe(env_->pending) + ")");
        }
    }
    explicit operator bool() const { return env_ != nullptr; }
    VmState& vm() { return *vm_; }
    HostEnv& env() { return *env_; }
    Ctx ctx() { return Ctx{*vm_, *env_, lock_, name_}; }

    std::nullptr_t fail(const std::string& msg) {
        vm_->report(std::string(name_) + ": " + msg);
        return nullptr;
    }
    void throwNew(const char* className, const std::string& message) {
        vm_->throwNew(*env_, className, utf16(message));
    }
    // failNewObject: the allocation fails as on a full heap.
    bool injectedOom(const ClassRec* c) {
        if (!vm_->failNew.count(c->name))
            return false;
        throwNew("java/lang/OutOfMemoryError", c->name);
        return true;
    }

    // The object behind a handle that JNI requires to be non-null.
    Obj* obj(const void* h, const char* role) {
        if (!h)
            return fail(std::string("null ") + role);
        Obj* o = vm_->resolve(h);
        return o ? o : fail(std::string(role) + " " + hex(h) + " is not a live object of this Vm");
    }
    // Null allowed; false only for a bad handle.
    bool optObj(const void* h, const char* role, Obj*& out) {
        out = h ? obj(h, role) : nullptr;
        return !h || out;
    }
    Obj* instance(const void* h, const ClassRec* want, const char* role) {
        Obj* o = obj(h, role);
        if (o && !vm_->isA(o->cls, want))
            return fail(std::string(role) + " is " + vm_->describe(o) + ", not a " + want->name);
        return o;
    }
    ClassRec* cls(const void* h, const char* role = "class") {
        Obj* o = obj(h, role);
        if (o && !o->asClass)
            return fail(std::string(role) + " is " + vm_->describe(o) + ", not a class");
        return o ? o->asClass : nullptr;
    }
    Obj* array(const void* h, bool ofObjects) {
        Obj* o = obj(h, "array");
        if (o && (o->cls->name[0] != '[' || (ofObjects && !o->cls->element))) {
            return fail("array is " + vm_->describe(o) + ", not " +
                        (ofObjects ? "an object array" : "an array"));
        }
        return o;
    }
    const Member* member(const void* id, bool field) {
        const std::string what = field ? "field ID" : "method ID";
        const auto* m = static_cast<const Member*>(id);
        if (!id)
            return fail("null " + what);
        if (!vm_->members.count(m))
            return fail(what + " " + hex(id) + " is not an ID of this Vm");
        if (m->isField != field)
            return fail(what + " " + memberName(m) + " is the wrong kind of ID");
        return m;
    }

    // The arguments of method `m`, from the va_list when given, else from the jvalue array;
    // reference arguments must be live objects of the declared classes.
    bool args(const Member* m, const jvalue* a, va_list* ap, std::vector<jvalue>& out) {
        const std::string& sig = m->sig;
        if (!ap && !a && sig[1] != ')') {
            fail("null argument array for " + memberName(m));
            return false;
        }
        for (size_t i = 1; sig[i] != ')';) {
            size_t end = sig.find_first_not_of('[', i);
            end = sig[end] == 'L' ? sig.find(';', end) + 1 : end + 1;
            const std::string type = sig.substr(i, end - i);
            i = end;
            jvalue v{};
            if (!ap) {
                v = a[out.size()];
            } else if (type[0] == 'J') {
                v.j = va_arg(*ap, jlong);
            } else if (kindOf(type) == 'L') {
                v.l = va_arg(*ap, jobject);
            } else {
                v.i = va_arg(*ap, int);  // Z, B, C, S, I arrive promoted; the union reads them back
            }
            if (kindOf(type) == 'L') {
                // The description is built only for a report: this runs for every argument.
                auto role = [&] { return "argument " + std::to_string(out.size() + 1) + " of " + m->name; };
                const ClassRec* want = vm_->classOfType(type);
                Obj* o = v.l ? vm_->resolve(v.l) : nullptr;
                if (v.l && !o) {
                    fail(role() + " " + hex(v.l) + " is not a live object of this Vm");
                    return false;
                }
                if (o && want && !vm_->isA(o->cls, want)) {
                    fail(role() + " is " + vm_->describe(o) + ", not a " + want->name);
                    return false;
                }
            }
            out.push_back(v);
        }
        out.push_back(jvalue{});  // so that data() is never null
        return true;
    }

    // Hands out a copy of `size` bytes, followed by a zero jchar, and records it.
    char* take(BlockKind kind, Obj* owner, const void* src, size_t size, jboolean* isCopy) {
        const uint64_t serial = vm_->nextSerial++;
        Block b{kind, owner, name_, currentThreadId(), serial, size, std::make_unique<char[]>(size + 2)};
        std::memcpy(b.data.get(), src, size);
        b.data[size] = b.data[size + 1] = 0;
        if (isCopy)
            *isCopy = JNI_TRUE;  // always a copy, so that a missing copy-back shows
        char* p = b.data.get();
        vm_->blocks.emplace(p, std::move(b));
        return p;
    }
    // The live block `p`, given back by `kind`'s Release function for `owner` (null when
    // that handle was bad, already reported).
    Block* findBlock(const void* p, const Obj* owner, BlockKind kind) {
        auto it = vm_->blocks.find(p);
        if (it == vm_->blocks.end()) {
            for (const Block& r : vm_->released) {
                if (r.data.get() == p) {
                    return fail("block " + hex(p) + " (" + r.takenBy + " of " + vm_->describe(r.owner) +
                                ") was released already by " + r.releasedBy);
                }
            }
            return fail(p ? "pointer " + hex(p) + " was never handed out by this host"
                          : "null pointer released");
        }
        Block& b = it->second;
        if (b.kind != kind)
            fail("releases a block taken by " + std::string(b.takenBy) + " (wrong Release function)");
        if (owner && b.owner != owner) {
            fail("block taken by " + std::string(b.takenBy) + " of " + vm_->describe(b.owner) +
                 " released against " + vm_->describe(owner));
        }
        return &b;
    }
    void retire(Block* b) {
        b->releasedBy = name_;
        const void* key = b->data.get();
        vm_->released.push_back(std::move(*b));
        vm_->blocks.erase(key);
        if (vm_->released.size() > 256)
            vm_->released.pop_front();  // its memory goes back only now
    }

private:
    const char* name_;
    HostEnv* env_;
    VmState* vm_ = nullptr;
    std::unique_lock<std::recursive_mutex> lock_;
};

template <class T>
using Id = T;  // so that Id<R>() also works for R = const char*

// clang-format off
#define ENTER(R, fn)                                                  \
    static_assert(slotOf(#fn) >= 0, #fn " is not a JNI table slot"); \
    Call c(env, std::integral_constant<int, slotOf(#fn)>::value);     \
    if (!c) return Id<R>()
// clang-format on

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

// ---- Classes and members ----

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

// ---- Objects and methods ----

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

// ---- Strings ----

Obj* str(Call& c, jstring s) {
    return c.instance(s, c.vm().cString, "string");
}

jsize JNICALL GetStringLength(JNIEnv* env, jstring s) {
    ENTER(jsize, GetStringLength);
    Obj* o = str(c, s);
    return o ? static_cast<jsize>(o->chars.size()) : 0;
}

const jchar* JNICALL GetStringChars(JNIEnv* env, jstring s, jboolean* isCopy) {
    ENTER(const jchar*, GetStringChars);
    Obj* o = str(c, s);
    if (!o)
        return nullptr;
    return reinterpret_cast<jchar*>(
        c.take(BlockKind::StringChars, o, o->chars.data(), o->chars.size() * 2, isCopy));
}

void releaseChars(Call& c, jstring s, const void* chars, BlockKind kind) {
    Obj* o = str(c, s);
    if (Block* b = c.findBlock(chars, o, kind))
        c.retire(b);
}

void JNICALL ReleaseStringChars(JNIEnv* env, jstring s, const jchar* chars) {
    ENTER(void, ReleaseStringChars);
    releaseChars(c, s, chars, BlockKind::StringChars);
}

jsize JNICALL GetStringUTFLength(JNIEnv* env, jstring s) {
    ENTER(jsize, GetStringUTFLength);
    Obj* o = str(c, s);
    return o ? static_cast<jsize>(toModifiedUtf8(o->chars).size()) : 0;
}

const char* JNICALL GetStringUTFChars(JNIEnv* env, jstring s, jboolean* isCopy) {
    ENTER(const char*, GetStringUTFChars);
    Obj* o = str(c, s);
    if (!o)
        return nullptr;
    const std::string m = toModifiedUtf8(o->chars);
    return c.take(BlockKind::StringUtfChars, o, m.data(), m.size(), isCopy);
}

void JNICALL ReleaseStringUTFChars(JNIEnv* env, jstring s, const char* chars) {
    ENTER(void, ReleaseStringUTFChars);
    releaseChars(c, s, chars, BlockKind::StringUtfChars);
}

// Java's bounds rule for a region, computed without overflow; throws when broken.
bool inBounds(Call& c, size_t size, jsize start, jsize len, const char* exception) {
    if (start >= 0 && len >= 0 && start <= static_cast<jsize>(size) - len)
        return true;
    c.throwNew(exception, "Region " + std::to_string(start) + ".." + std::to_string(int64_t(start) + len) +
                              " out of bounds for length " + std::to_string(size));
    return false;
}

void JNICALL GetStringRegion(JNIEnv* env, jstring s, jsize start, jsize len, jchar* buf) {
    ENTER(void, GetStringRegion);
    Obj* o = str(c, s);
    if (!o || !inBounds(c, o->chars.size(), start, len, "java/lang/StringIndexOutOfBoundsException"))
        return;
    if (!buf && len > 0)
        c.fail("null buffer");
    if (buf)
        std::memcpy(buf, o->chars.data() + start, len * sizeof(jchar));
}

void JNICALL GetStringUTFRegion(JNIEnv* env, jstring s, jsize start, jsize len, char* buf) {
    ENTER(void, GetStringUTFRegion);
    Obj* o = str(c, s);
    if (!o || !inBounds(c, o->chars.size(), start, len, "java/lang/StringIndexOutOfBoundsException"))
        return;
    const std::string m = toModifiedUtf8(o->chars.substr(start, len));
    if (!buf)
        c.fail("null buffer");
    if (buf)
        std::memcpy(buf, m.c_str(), m.size() + 1);  // terminated, as by the JVM
}

jstring JNICALL NewString(JNIEnv* env, const jchar* unicode, jsize len) {
    ENTER(jstring, NewString);
    if (len < 0 || (!unicode && len > 0))
        return c.fail("null text or negative length");
    if (c.injectedOom(c.vm().cString))
        return nullptr;
    return static_cast<jstring>(
        handle(c.vm().makeString(std::u16string(reinterpret_cast<const char16_t*>(unicode), len))));
}

jstring JNICALL NewStringUTF(JNIEnv* env, const char* utf) {
    ENTER(jstring, NewStringUTF);
    if (!utf)
        return nullptr;  // as HotSpot, without an exception
    std::u16string text;
    if (!fromModifiedUtf8(utf, text)) {
        std::string bytes;  // shown escaped: the usual cause is ANSI or standard UTF-8 text
        for (const char* p = utf; *p && bytes.size() < 160; ++p) {
            char b[8];
            std::snprintf(b, sizeof b, (*p & 0x80) || *p < 0x20 ? "\\x%02X" : "%c",
                          static_cast<unsigned char>(*p));
            bytes += b;
        }
        c.fail("\"" + bytes + "\" is not modified UTF-8");
    }
    if (c.injectedOom(c.vm().cString))
        return nullptr;
    return static_cast<jstring>(handle(c.vm().makeString(std::move(text))));
}

// ---- Arrays ----

jsize JNICALL GetArrayLength(JNIEnv* env, jarray array) {
    ENTER(jsize, GetArrayLength);
    Obj* o = c.array(array, false);
    return o ? static_cast<jsize>(o->cls == c.vm().cByteArray ? o->bytes.size() : o->elems.size()) : 0;
}

jbyteArray JNICALL NewByteArray(JNIEnv* env, jsize len) {
    ENTER(jbyteArray, NewByteArray);
    if (len < 0)
        c.throwNew("java/lang/NegativeArraySizeException", std::to_string(len));
    if (len < 0 || c.injectedOom(c.vm().cByteArray))
        return nullptr;
    Obj* o = c.vm().make(c.vm().cByteArray);
    o->bytes.assign(len, 0);
    return static_cast<jbyteArray>(handle(o));
}

Obj* byteArray(Call& c, jarray a) {
    return c.instance(a, c.vm().cByteArray, "array");
}

jbyte* JNICALL GetByteArrayElements(JNIEnv* env, jbyteArray array, jboolean* isCopy) {
    ENTER(jbyte*, GetByteArrayElements);
    Obj* o = byteArray(c, array);
    return o ? reinterpret_cast<jbyte*>(
                   c.take(BlockKind::ByteElements, o, o->bytes.data(), o->bytes.size(), isCopy))
             : nullptr;
}

// Mode 0 copies back and frees, JNI_COMMIT copies back and keeps, JNI_ABORT only frees.
void releaseElements(Call& c, Obj* o, const void* elems, jint mode, BlockKind kind) {
    Block* b = c.findBlock(elems, o, kind);
    if (!b)
        return;
    if (mode != 0 && mode != JNI_COMMIT && mode != JNI_ABORT)
        c.fail("unknown mode " + std::to_string(mode));
    if (mode != JNI_ABORT) {
        std::memcpy(b->owner->bytes.data(), b->data.get(), std::min(b->size, b->owner->bytes.size()));
        ++c.vm().copyBacks;
    }
    if (mode != JNI_COMMIT)
        c.retire(b);
}

void JNICALL ReleaseByteArrayElements(JNIEnv* env, jbyteArray array, jbyte* elems, jint mode) {
    ENTER(void, ReleaseByteArrayElements);
    releaseElements(c, byteArray(c, array), elems, mode, BlockKind::ByteElements);
}

void JNICALL GetByteArrayRegion(JNIEnv* env, jbyteArray array, jsize start, jsize len, jbyte* buf) {
    ENTER(void, GetByteArrayRegion);
    Obj* o = byteArray(c, array);
    if (!o || !inBounds(c, o->bytes.size(), start, len, "java/lang/ArrayIndexOutOfBoundsException"))
        return;
    if (!buf && len > 0)
        c.fail("null buffer");
    if (buf && len > 0)
        std::memcpy(buf, o->bytes.data() + start, len);
}

void JNICALL SetByteArrayRegion(JNIEnv* env, jbyteArray array, jsize start, jsize len, const jbyte* buf) {
    ENTER(void, SetByteArrayRegion);
    Obj* o = byteArray(c, array);
    if (!o || !inBounds(c, o->bytes.size(), start, len, "java/lang/ArrayIndexOutOfBoundsException"))
        return;
    if (!buf && len > 0)
        c.fail("null buffer");
    if (buf && len > 0)
        std::memcpy(o->bytes.data() + start, buf, len);
}

jobjectArray JNICALL NewObjectArray(JNIEnv* env, jsize len, jclass clazz, jobject init) {
    ENTER(jobjectArray, NewObjectArray);
    ClassRec* k = c.cls(clazz, "element class");
    Obj* first;
    if (!k || !c.optObj(init, "initial element", first))
        return nullptr;
    if (first && !c.vm().isA(first->cls, k))
        return c.fail("initial element " + c.vm().describe(first) + " is not a " + k->name);
    if (len < 0)
        c.throwNew("java/lang/NegativeArraySizeException", std::to_string(len));
    ClassRec* arrayClass = c.vm().arrayOf(k);
    if (len < 0 || c.injectedOom(arrayClass))
        return nullptr;
    Obj* o = c.vm().make(arrayClass);
    o->elems.assign(len, first);
    return static_cast<jobjectArray>(handle(o));
}

// The object array, when index is inside it; otherwise ArrayIndexOutOfBoundsException.
Obj* element(Call& c, jobjectArray array, jsize index) {
    Obj* o = c.array(array, true);
    if (!o || (index >= 0 && static_cast<size_t>(index) < o->elems.size()))
        return o;
    c.throwNew(
        "java/lang/ArrayIndexOutOfBoundsException",
        "Index " + std::to_string(index) + " out of bounds for length " + std::to_string(o->elems.size()));
    return nullptr;
}

jobject JNICALL GetObjectArrayElement(JNIEnv* env, jobjectArray array, jsize index) {
    ENTER(jobject, GetObjectArrayElement);
    Obj* o = element(c, array, index);
    return o ? handle(o->elems[index]) : nullptr;
}

void JNICALL SetObjectArrayElement(JNIEnv* env, jobjectArray array, jsize index, jobject val) {
    ENTER(void, SetObjectArrayElement);
    Obj* o = element(c, array, index);
    Obj* v;
    if (!o || !c.optObj(val, "value", v))
        return;
    if (v && !c.vm().isA(v->cls, o->cls->element))
        return c.throwNew("java/lang/ArrayStoreException", v->cls->name);
    o->elems[index] = v;
}

void* JNICALL GetPrimitiveArrayCritical(JNIEnv* env, jarray array, jboolean* isCopy) {
    ENTER(void*, GetPrimitiveArrayCritical);
    Obj* o = byteArray(c, array);
    return o ? c.take(BlockKind::ArrayCritical, o, o->bytes.data(), o->bytes.size(), isCopy) : nullptr;
}

void JNICALL ReleasePrimitiveArrayCritical(JNIEnv* env, jarray array, void* carray, jint mode) {
    ENTER(void, ReleasePrimitiveArrayCritical);
    releaseElements(c, byteArray(c, array), carray, mode, BlockKind::ArrayCritical);
}

const jchar* JNICALL GetStringCritical(JNIEnv* env, jstring s, jboolean* isCopy) {
    ENTER(const jchar*, GetStringCritical);
    Obj* o = str(c, s);
    return o ? reinterpret_cast<jchar*>(
                   c.take(BlockKind::StringCritical, o, o->chars.data(), o->chars.size() * 2, isCopy))
             : nullptr;
}

void JNICALL ReleaseStringCritical(JNIEnv* env, jstring s, const jchar* chars) {
    ENTER(void, ReleaseStringCritical);
    releaseChars(c, s, chars, BlockKind::StringCritical);
}

// ---- The table ----

// For the functions the library is not expected to use. A trap has no sensible value to
// return, so it names its slot and ends the process. It is cdecl without parameters: as it
// never returns, how the caller passed arguments does not matter.
template <int N>
void trap() {
    std::fprintf(stderr, "JNI host: unexpected call to %s\n", kSlotNames[N]);
    terminateProcess(3);
}
template <size_t... I>
std::array<void (*)(), sizeof...(I)> traps(std::index_sequence<I...>) {
    return {{&trap<static_cast<int>(I)>...}};
}

}  // namespace

const JNINativeInterface_* functionTable() {
    static const JNINativeInterface_ table = [] {
        JNINativeInterface_ t;
        const auto all = traps(std::make_index_sequence<kSlotCount>());
        static_assert(sizeof t == sizeof all, "jni_slot_names.inc does not match jni.h: regenerate it");
        std::memcpy(static_cast<void*>(&t), all.data(), sizeof t);
        // Assigned member by member, so that the compiler checks each signature against jni.h.
#define SLOT(fn) t.fn = fn
        SLOT(GetVersion), SLOT(FindClass), SLOT(GetSuperclass), SLOT(IsAssignableFrom), SLOT(GetObjectClass);
        SLOT(IsInstanceOf), SLOT(IsSameObject), SLOT(GetMethodID), SLOT(GetStaticMethodID), SLOT(GetFieldID);
        SLOT(NewObject), SLOT(NewObjectV), SLOT(NewObjectA), SLOT(AllocObject);
        SLOT(CallObjectMethod), SLOT(CallObjectMethodV), SLOT(CallObjectMethodA);
        SLOT(CallBooleanMethod), SLOT(CallBooleanMethodV), SLOT(CallBooleanMethodA);
        SLOT(CallIntMethod), SLOT(CallIntMethodV), SLOT(CallIntMethodA);
        SLOT(CallVoidMethod), SLOT(CallVoidMethodV), SLOT(CallVoidMethodA);
        SLOT(GetIntField), SLOT(SetIntField), SLOT(GetLongField), SLOT(SetLongField);
        SLOT(GetBooleanField), SLOT(SetBooleanField), SLOT(GetObjectField), SLOT(SetObjectField);
        SLOT(ExceptionOccurred), SLOT(ExceptionCheck), SLOT(ExceptionClear), SLOT(ExceptionDescribe);
        SLOT(Throw), SLOT(ThrowNew), SLOT(DeleteLocalRef), SLOT(NewLocalRef), SLOT(EnsureLocalCapacity);
        SLOT(PushLocalFrame), SLOT(PopLocalFrame);
        SLOT(GetStringLength), SLOT(GetStringChars), SLOT(ReleaseStringChars), SLOT(GetStringUTFLength);
        SLOT(GetStringUTFChars), SLOT(ReleaseStringUTFChars), SLOT(GetStringRegion), SLOT(GetStringUTFRegion);
        SLOT(NewString), SLOT(NewStringUTF), SLOT(GetArrayLength), SLOT(NewByteArray);
        SLOT(GetByteArrayElements), SLOT(ReleaseByteArrayElements), SLOT(GetByteArrayRegion);
        SLOT(SetByteArrayRegion), SLOT(NewObjectArray), SLOT(GetObjectArrayElement),
            SLOT(SetObjectArrayElement);
        SLOT(GetPrimitiveArrayCritical), SLOT(ReleasePrimitiveArrayCritical);
        SLOT(GetStringCritical), SLOT(ReleaseStringCritical);
#undef SLOT
        return t;
    }();
    return &table;
}

}  // namespace jnihost
