// The host-side API for Java values: tests make strings, arrays, Hashtables, points and
// other objects, and read them back, without a JNI call.
#include "vm_state.h"

namespace jnihost {

namespace {
// The object behind a handle given to the host-side API, checked to be a `want`.
Obj* hostObj(VmState& s, jobject h, const ClassRec* want, const char* function) {
    Obj* o = s.resolve(h);
    if (o && s.isA(o->cls, want))
        return o;
    s.report(std::string("Vm::") + function + ": " + (o ? s.describe(o) : "handle " + hex(h)) +
             " is not a live " + want->name);
    return nullptr;
}

// A field of `obj` by name, checked to be a long ('J') or a reference ('L').
jvalue* hostField(VmState& s, jobject obj, const char* name, char kind, const char* function) {
    Obj* o = hostObj(s, obj, s.cObject, function);
    const Member* f = o ? s.fieldByName(o->cls, name) : nullptr;
    if (f && (f->sig[0] == '[' ? 'L' : f->sig[0]) == kind)
        return &o->fields[f];
    if (o)
        s.report(std::string("Vm::") + function + ": " + o->cls->name + " has no such field " + name);
    return nullptr;
}
}  // namespace

jstring Vm::newString(const std::u16string& text) {
    HOST_LOCK;
    return static_cast<jstring>(handle(state_->makeString(text)));
}

jstring Vm::newStringUtf8(const std::string& text) {
    return newString(utf16(text));
}

std::u16string Vm::stringValue(jobject s) {
    HOST_LOCK;
    Obj* o = hostObj(*state_, s, state_->cString, "stringValue");
    return o ? o->chars : std::u16string();
}

std::string Vm::stringUtf8(jobject s) {
    return utf8(stringValue(s));
}

jbyteArray Vm::newByteArray(const std::vector<uint8_t>& bytes) {
    HOST_LOCK;
    Obj* o = state_->make(state_->cByteArray);
    o->bytes.assign(bytes.begin(), bytes.end());
    return static_cast<jbyteArray>(handle(o));
}

std::vector<uint8_t> Vm::byteArrayValue(jobject array) {
    HOST_LOCK;
    Obj* o = hostObj(*state_, array, state_->cByteArray, "byteArrayValue");
    return o ? std::vector<uint8_t>(o->bytes.begin(), o->bytes.end()) : std::vector<uint8_t>();
}

jobjectArray Vm::newStringArray(const std::vector<jobject>& elements) {
    HOST_LOCK;
    Obj* a = state_->make(state_->arrayOf(state_->cString));
    for (jobject e : elements)
        a->elems.push_back(e ? hostObj(*state_, e, state_->cString, "newStringArray") : nullptr);
    return static_cast<jobjectArray>(handle(a));
}

std::vector<jobject> Vm::objectArrayValue(jobject array) {
    HOST_LOCK;
    std::vector<jobject> out;
    Obj* a = state_->resolve(array);
    if (!a || !a->cls->element) {
        state_->report("Vm::objectArrayValue: " + (a ? state_->describe(a) : hex(array)) +
                       " is not an object array");
        return out;
    }
    for (Obj* e : a->elems)
        out.push_back(handle(e));
    return out;
}

jobject Vm::newInteger(int32_t value) {
    HOST_LOCK;
    Obj* o = state_->make(state_->cInteger);
    o->intValue = value;
    return handle(o);
}

int32_t Vm::integerValue(jobject integer) {
    HOST_LOCK;
    Obj* o = hostObj(*state_, integer, state_->cInteger, "integerValue");
    return o ? o->intValue : 0;
}

jobject Vm::newPoint(int32_t x, int32_t y, bool subclass) {
    HOST_LOCK;
    Obj* o = state_->make(subclass ? state_->findClass(kPointSubclass) : state_->cPoint);
    state_->field(o, "x").i = x;
    state_->field(o, "y").i = y;
    return handle(o);
}

std::pair<int32_t, int32_t> Vm::pointValue(jobject point) {
    HOST_LOCK;
    Obj* o = hostObj(*state_, point, state_->cPoint, "pointValue");
    return {o ? state_->field(o, "x").i : 0, o ? state_->field(o, "y").i : 0};
}

jobject Vm::newHashtable() {
    HOST_LOCK;
    return handle(state_->make(state_->cHashtable));
}

void Vm::hashtablePut(jobject table, jobject key, jobject value) {
    HOST_LOCK;
    Obj* t = hostObj(*state_, table, state_->cHashtable, "hashtablePut");
    Obj* k = hostObj(*state_, key, state_->cObject, "hashtablePut");
    Obj* v = hostObj(*state_, value, state_->cObject, "hashtablePut");
    if (t && k && v)
        state_->hashtablePut(t, k, v);
}

void Vm::hashtablePutNullValue(jobject table, jobject key) {
    HOST_LOCK;
    Obj* t = hostObj(*state_, table, state_->cHashtable, "hashtablePutNullValue");
    Obj* k = hostObj(*state_, key, state_->cObject, "hashtablePutNullValue");
    if (t && k)
        state_->hashtablePut(t, k, nullptr);
}

jobject Vm::hashtableGet(jobject table, jobject key) {
    HOST_LOCK;
    Obj* t = hostObj(*state_, table, state_->cHashtable, "hashtableGet");
    Obj* k = hostObj(*state_, key, state_->cObject, "hashtableGet");
    return t && k ? handle(state_->hashtableGet(t, k)) : nullptr;
}

std::vector<std::pair<jobject, jobject>> Vm::hashtableEntries(jobject table) {
    HOST_LOCK;
    std::vector<std::pair<jobject, jobject>> out;
    if (Obj* t = hostObj(*state_, table, state_->cHashtable, "hashtableEntries")) {
        for (const auto& e : t->entries)
            out.emplace_back(handle(e.first), handle(e.second));
    }
    return out;
}

jobject Vm::newPlainObject() {
    HOST_LOCK;
    return handle(state_->make(state_->cObject));
}

jobject Vm::newInstance(const char* className) {
    HOST_LOCK;
    ClassRec* c = state_->findClass(className);
    if (c && !c->isInterface && c->name[0] != '[')
        return handle(state_->make(c));
    state_->report(std::string("Vm::newInstance: ") + className + " is not a known instantiable class");
    return nullptr;
}

jobject Vm::newValidator(ValidatorFn fn) {
    HOST_LOCK;
    Obj* o = state_->make(state_->cValidatorImpl);
    o->validator = std::move(fn);
    return handle(o);
}

void Vm::setLongField(jobject obj, const char* name, int64_t value) {
    HOST_LOCK;
    if (jvalue* v = hostField(*state_, obj, name, 'J', "setLongField"))
        v->j = value;
}

int64_t Vm::longField(jobject obj, const char* name) {
    HOST_LOCK;
    jvalue* v = hostField(*state_, obj, name, 'J', "longField");
    return v ? v->j : 0;
}

void Vm::setObjectField(jobject obj, const char* name, jobject value) {
    HOST_LOCK;
    if (value && !hostObj(*state_, value, state_->cObject, "setObjectField"))
        return;
    if (jvalue* v = hostField(*state_, obj, name, 'L', "setObjectField"))
        v->l = value;
}

jobject Vm::objectField(jobject obj, const char* name) {
    HOST_LOCK;
    jvalue* v = hostField(*state_, obj, name, 'L', "objectField");
    return v ? v->l : nullptr;
}

std::string Vm::classNameOf(jobject obj) {
    HOST_LOCK;
    Obj* o = hostObj(*state_, obj, state_->cObject, "classNameOf");
    return o ? o->cls->name : std::string();
}

}  // namespace jnihost
