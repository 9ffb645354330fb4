// The host side of the JNI host: the classes it knows, the object store and the host-side
// API used by tests (Library, which calls the DLL's exports, is in library.cpp).
#include <windows.h>

#include <pthread.h>

#include <algorithm>
#include <cstdio>

#include "vm_state.h"

namespace jnihost {

// ---- Registry of live envs and Vms: a JNIEnv pointer is checked before it is used ----

namespace {
struct Registry {
    std::mutex mu;
    std::unordered_set<const void*> envs;
    std::vector<VmState*> vms;
};
// Never destroyed, so that a Vm in a static object may still unregister at exit.
Registry& registry() {
    static Registry* r = new Registry;
    return *r;
}
}  // namespace

HostEnv* lookupEnv(const void* env) {
    std::lock_guard<std::mutex> g(registry().mu);
    return registry().envs.count(env) ? static_cast<HostEnv*>(const_cast<void*>(env)) : nullptr;
}

void reportUnknownEnv(const void* env, const char* function) {
    std::unique_lock<std::mutex> g(registry().mu);
    VmState* vm = registry().vms.empty() ? nullptr : registry().vms.back();
    g.unlock();
    const std::string msg = std::string(function) + ": JNIEnv " + hex(env) +
                            " is not an env of this host (stale, or from another Vm)";
    if (vm) {
        vm->report(msg);
    } else {
        std::fprintf(stderr, "JNI host violation: %s\n", msg.c_str());
    }
}

std::string hex(const void* p) {
    char buf[32];
    std::snprintf(buf, sizeof buf, "%p", p);
    return buf;
}

unsigned long currentThreadId() {
    return GetCurrentThreadId();
}

void terminateProcess(unsigned exitCode) {
    std::fflush(nullptr);
    TerminateProcess(GetCurrentProcess(), exitCode);
    std::abort();  // not reached
}

// ---- Classes ----

VmState::VmState() {
    cObject = defineClass("java/lang/Object", nullptr);
    cClass = defineClass("java/lang/Class", cObject);
    cObject->mirror = make(cClass);
    cObject->mirror->asClass = cObject;
    const MethodImpl noop = [](Ctx&, Obj*, const jvalue*) { return jvalue{}; };
    addMember(cObject, "<init>", "()V", noop);
    cString = defineClass("java/lang/String", cObject);
    cInteger = defineClass("java/lang/Integer", cObject);
    addMember(cInteger, "<init>", "(I)V", [](Ctx&, Obj* self, const jvalue* a) {
        self->intValue = a[0].i;
        return jvalue{};
    });
    addMember(cInteger, "intValue", "()I", [](Ctx&, Obj* self, const jvalue*) { return jv(self->intValue); });

    cThrowable = defineClass("java/lang/Throwable", cObject);
    addMember(cThrowable, "detailMessage", "Ljava/lang/String;");
    detailMessage = cThrowable->members.back().get();
    const MethodImpl throwableInit = [](Ctx& c, Obj* self, const jvalue* a) {
        c.vm.field(self, "detailMessage") = a[0];
        return jvalue{};
    };
    addMember(cThrowable, "<init>", "(Ljava/lang/String;)V", throwableInit);
    // Name and superclass; each gets the (String) constructor.
    const std::pair<const char*, const char*> throwables[] = {
        {"java/lang/Exception", "java/lang/Throwable"},
        {"java/lang/RuntimeException", "java/lang/Exception"},
        {"java/lang/Error", "java/lang/Throwable"},
        {"java/lang/LinkageError", "java/lang/Error"},
        {"java/lang/NoClassDefFoundError", "java/lang/LinkageError"},
        {"java/lang/IncompatibleClassChangeError", "java/lang/LinkageError"},
        {"java/lang/NoSuchMethodError", "java/lang/IncompatibleClassChangeError"},
        {"java/lang/NoSuchFieldError", "java/lang/IncompatibleClassChangeError"},
        {"java/lang/VirtualMachineError", "java/lang/Error"},
        {"java/lang/OutOfMemoryError", "java/lang/VirtualMachineError"},
        {"java/lang/IndexOutOfBoundsException", "java/lang/RuntimeException"},
        {"java/lang/ArrayIndexOutOfBoundsException", "java/lang/IndexOutOfBoundsException"},
        {"java/lang/StringIndexOutOfBoundsException", "java/lang/IndexOutOfBoundsException"},
        {"java/lang/NullPointerException", "java/lang/RuntimeException"},
        {"java/lang/ArrayStoreException", "java/lang/RuntimeException"},
        {"java/lang/NegativeArraySizeException", "java/lang/RuntimeException"},
        {"java/util/NoSuchElementException", "java/lang/RuntimeException"},
        {kCoreUtilException, "java/lang/Exception"},
    };
    for (const auto& [name, super] : throwables) {
        addMember(defineClass(name, findClass(super)), "<init>", "(Ljava/lang/String;)V", throwableInit);
    }

    // Boxed numbers that are not Integer: objects a caller may put where Integer belongs.
    ClassRec* number = defineClass("java/lang/Number", cObject);
    for (const char* boxed : {"java/lang/Long", "java/lang/Double"})
        addMember(defineClass(boxed, number), "<init>", "()V", noop);

    cPoint = defineClass(kPointClass, cObject);
    addMember(cPoint, "x", "I");
    addMember(cPoint, "y", "I");
    const MethodImpl pointInit = [](Ctx& c, Obj* self, const jvalue* a) {
        c.vm.field(self, "x").i = a[0].i;
        c.vm.field(self, "y").i = a[1].i;
        return jvalue{};
    };
    addMember(cPoint, "<init>", "(II)V", pointInit);
    addMember(defineClass(kPointSubclass, cPoint), "<init>", "(II)V", pointInit);

    ClassRec* enumeration = defineClass("java/util/Enumeration", nullptr, true);
    addMember(enumeration, "hasMoreElements", "()Z",
              [](Ctx&, Obj* self, const jvalue*) { return jv(self->cursor < self->elems.size()); });
    addMember(enumeration, "nextElement", "()Ljava/lang/Object;", [](Ctx& c, Obj* self, const jvalue*) {
        if (self->cursor < self->elems.size())
            return jv(self->elems[self->cursor++]);
        c.vm.throwNew(c.env, "java/util/NoSuchElementException", u"Hashtable Enumerator");
        return jvalue{};
    });
    cEnumerator = defineClass("java/util/Hashtable$Enumerator", cObject, false, {enumeration});

    // Hashtable refuses null keys and values with a NullPointerException, as in Java.
    cHashtable = defineClass("java/util/Hashtable", cObject);
    addMember(cHashtable, "<init>", "()V", noop);
    addMember(cHashtable, "put", "(Ljava/lang/Object;Ljava/lang/Object;)Ljava/lang/Object;",
              [](Ctx& c, Obj* self, const jvalue* a) {
                  if (a[0].l && a[1].l)
                      return jv(c.vm.hashtablePut(self, objOf(a[0].l), objOf(a[1].l)));
                  c.vm.throwNew(c.env, "java/lang/NullPointerException", u"", true);
                  return jvalue{};
              });
    addMember(cHashtable, "get", "(Ljava/lang/Object;)Ljava/lang/Object;",
              [](Ctx& c, Obj* self, const jvalue* a) {
                  if (a[0].l)
                      return jv(c.vm.hashtableGet(self, objOf(a[0].l)));
                  c.vm.throwNew(c.env, "java/lang/NullPointerException", u"", true);
                  return jvalue{};
              });
    addMember(cHashtable, "keys", "()Ljava/util/Enumeration;", [](Ctx& c, Obj* self, const jvalue*) {
        Obj* e = c.vm.make(c.vm.cEnumerator);
        for (const auto& entry : self->entries)
            e->elems.push_back(entry.first);
        return jv(e);
    });
    addMember(cHashtable, "size", "()I",
              [](Ctx&, Obj* self, const jvalue*) { return jv(static_cast<jint>(self->entries.size())); });

    cByteArray = defineClass("[B", cObject);
    arrayOf(cString);

    ClassRec* validator = defineClass(kValidatorInterface, nullptr, true);
    addMember(validator, "validateDirectory", "(Ljava/lang/String;)Z",
              [](Ctx& c, Obj* self, const jvalue* a) {
                  const ValidatorFn fn = self->validator;
                  const std::string path = a[0].l ? utf8(objOf(a[0].l)->chars) : std::string();
                  c.lock.unlock();
                  const bool result = fn && fn(reinterpret_cast<JNIEnv*>(&c.env), path);
                  c.lock.lock();
                  // After a throw JNI leaves the value undefined; the host hands back the
                  // validator's own answer, so a caller that reads it anyway is seen.
                  return jv(result);
              });
    cValidatorImpl = defineClass("jnihost/TestValidator", cObject, false, {validator});

    ClassRec* fileChooser = defineClass(kFileChooserClass, cObject);
    ClassRec* dirChooser = defineClass(kDirectoryChooserClass, cObject);
    for (const char* f : {"hwnd", "centerx", "centery"}) {
        addMember(fileChooser, f, "J");
        addMember(dirChooser, f, "J");
    }
    addMember(dirChooser, "browseFlags", "J");
    addMember(dirChooser, "title", "Ljava/lang/String;");
    addMember(dirChooser, "startpath", "Ljava/lang/String;");
    addMember(dirChooser, "validator", std::string("L") + kValidatorInterface + ";");

    std::lock_guard<std::mutex> g(registry().mu);
    registry().vms.push_back(this);
}

VmState::~VmState() {
    Registry& r = registry();
    {
        std::lock_guard<std::mutex> g(r.mu);
        for (const auto& e : envs)
            r.envs.erase(e.second.get());
        r.vms.erase(std::remove(r.vms.begin(), r.vms.end(), this), r.vms.end());
    }
#ifdef __WINPTHREADS_VERSION
    // libstdc++ gives a mutex with a static initializer a trivial destructor, and winpthreads
    // allocates a mutex's state at its first lock: without these calls each Vm leaves 20 bytes
    // per mutex behind, which a leak measurement would charge to the library under test.
    pthread_mutex_destroy(mu.native_handle());
    pthread_mutex_destroy(violationMu.native_handle());
#endif
}

ClassRec* VmState::defineClass(const std::string& name, ClassRec* super, bool isInterface,
                               std::vector<ClassRec*> interfaces) {
    auto& c = classes[name];
    c = std::make_unique<ClassRec>();
    c->name = name;
    c->super = super;
    c->interfaces = std::move(interfaces);
    c->isInterface = isInterface;
    if (cClass) {
        c->mirror = make(cClass);
        c->mirror->asClass = c.get();
    }
    return c.get();
}

// A field when impl is null, else a method.
void VmState::addMember(ClassRec* c, const std::string& name, const std::string& sig, MethodImpl impl) {
    c->members.emplace_back(new Member{c, name, sig, impl == nullptr, impl});
    members.insert(c->members.back().get());
}

ClassRec* VmState::findClass(const std::string& name) {
    auto it = classes.find(name);
    if (it != classes.end())
        return it->second.get();
    ClassRec* element = nullptr;
    if (name.size() > 3 && name[0] == '[' && name[1] == 'L' && name.back() == ';') {
        element = findClass(name.substr(2, name.size() - 3));
    } else if (name.size() > 2 && name[0] == '[' && name[1] == '[') {
        element = findClass(name.substr(1));
    }
    return element ? arrayOf(element) : nullptr;
}

ClassRec* VmState::arrayOf(ClassRec* element) {
    const std::string name = element->name[0] == '[' ? "[" + element->name : "[L" + element->name + ";";
    auto it = classes.find(name);
    if (it != classes.end())
        return it->second.get();
    ClassRec* c = defineClass(name, cObject);
    c->element = element;
    return c;
}

ClassRec* VmState::classOfType(const std::string& t) {
    if (t.size() > 2 && t[0] == 'L')
        return findClass(t.substr(1, t.size() - 2));
    return t.size() > 1 && t[0] == '[' ? findClass(t) : nullptr;
}

const Member* VmState::findMember(const ClassRec* c, const std::string& name, const std::string& sig,
                                  bool field) const {
    for (const ClassRec* k = c; k; k = k->super) {
        for (const auto& m : k->members) {
            if (m->isField == field && m->name == name && m->sig == sig)
                return m.get();
        }
        if (name == "<init>")
            return nullptr;  // constructors are not inherited
        for (const ClassRec* i : k->interfaces) {
            if (const Member* m = field ? nullptr : findMember(i, name, sig, false))
                return m;
        }
    }
    return nullptr;
}

const Member* VmState::fieldByName(const ClassRec* c, const std::string& name) const {
    for (const ClassRec* k = c; k; k = k->super) {
        for (const auto& m : k->members) {
            if (m->isField && m->name == name)
                return m.get();
        }
    }
    return nullptr;
}

bool VmState::isA(const ClassRec* c, const ClassRec* target) const {
    if (!c || !target)
        return false;
    if (c == target || target == cObject || (c->super && isA(c->super, target)))
        return true;
    for (const ClassRec* i : c->interfaces) {
        if (isA(i, target))
            return true;
    }
    return c->element && target->element && isA(c->element, target->element);  // String[] is an Object[]
}

// ---- Objects ----

Obj* VmState::make(ClassRec* c) {
    objects.push_back(std::make_unique<Obj>());
    objects.back()->cls = c;
    live.insert(objects.back().get());
    return objects.back().get();
}

Obj* VmState::makeString(std::u16string chars) {
    Obj* o = make(cString);
    o->chars = std::move(chars);
    return o;
}

Obj* VmState::resolve(const void* h) const {
    Obj* o = static_cast<Obj*>(const_cast<void*>(h));
    return live.count(o) ? o : nullptr;
}

namespace {
// Java's equals for the keys the library uses: String by content, Integer by value.
bool javaEquals(const VmState& s, const Obj* a, const Obj* b) {
    if (a == b)
        return true;
    if (a->cls != b->cls)
        return false;
    return a->cls == s.cString ? a->chars == b->chars : a->cls == s.cInteger && a->intValue == b->intValue;
}

// Hashed as Java hashes the keys the library uses, so equal keys meet in one bucket and a
// table of thousands of entries costs what it costs in a real JVM, not a scan per call.
size_t javaHash(const VmState& s, const Obj* key) {
    if (key->cls == s.cString)
        return std::hash<std::u16string>()(key->chars);
    if (key->cls == s.cInteger)
        return static_cast<size_t>(key->intValue);
    return std::hash<const Obj*>()(key);
}

std::pair<Obj*, Obj*>* findEntry(const VmState& s, Obj* table, Obj* key) {
    auto [first, last] = table->entryIndex.equal_range(javaHash(s, key));
    for (auto it = first; it != last; ++it) {
        auto& entry = table->entries[it->second];
        if (javaEquals(s, entry.first, key))
            return &entry;
    }
    return nullptr;
}
}  // namespace

Obj* VmState::hashtableGet(Obj* table, Obj* key) const {
    const auto* entry = findEntry(*this, table, key);
    return entry ? entry->second : nullptr;
}

Obj* VmState::hashtablePut(Obj* table, Obj* key, Obj* value) {
    if (auto* entry = findEntry(*this, table, key))
        return std::exchange(entry->second, value);
    table->entryIndex.emplace(javaHash(*this, key), table->entries.size());
    table->entries.emplace_back(key, value);
    return nullptr;
}

void VmState::throwNew(HostEnv& env, const std::string& className, const std::u16string& message,
                       bool nullMessage) {
    Obj* e = make(findClass(className));
    if (!nullMessage)
        field(e, "detailMessage").l = handle(makeString(message));
    env.pending = e;
}

std::string VmState::describe(const Obj* o) const {
    const std::string& name = o->cls->name;
    if (o->cls == cString) {
        return name + " \"" + utf8(o->chars.substr(0, 60)) + (o->chars.size() > 60 ? "...\"" : "\"");
    }
    if (name[0] == '[') {
        return name + " of length " +
               std::to_string(o->cls == cByteArray ? o->bytes.size() : o->elems.size());
    }
    if (o->asClass)
        return "class " + o->asClass->name;
    auto it = o->fields.find(detailMessage);
    return it == o->fields.end() || !it->second.l ? name : name + ": " + utf8(objOf(it->second.l)->chars);
}

void VmState::report(const std::string& msg) {
    std::unique_lock<std::mutex> g(violationMu);
    violationList.push_back(msg);
    const auto h = handler;
    g.unlock();
    if (h) {
        h(msg);
    } else {
        std::fprintf(stderr, "JNI host violation: %s\n", msg.c_str());
        std::fflush(stderr);
    }
}

HostEnv& VmState::envOfThisThread() {
    std::lock_guard<std::recursive_mutex> g(mu);
    auto& env = envs[GetCurrentThreadId()];
    if (!env) {
        env.reset(new HostEnv{functionTable(), this, GetCurrentThreadId()});
        std::lock_guard<std::mutex> r(registry().mu);
        registry().envs.insert(env.get());
    }
    return *env;
}

void VmState::afterCall(const char* exportName, unsigned long thread, uint64_t serial) {
    std::vector<std::string> leaks;
    {
        std::lock_guard<std::recursive_mutex> g(mu);
        for (auto it = blocks.begin(); it != blocks.end();) {
            const Block& b = it->second;
            if (b.thread != thread || b.serial < serial) {
                ++it;
                continue;
            }
            const bool critical = b.kind == BlockKind::StringCritical || b.kind == BlockKind::ArrayCritical;
            leaks.push_back(std::string(exportName) + ": " + b.takenBy + " of " + describe(b.owner) +
                            (critical ? " still open: critical region not ended" : " never released"));
            it = blocks.erase(it);  // reported once; a late release is then "never handed out"
        }
    }
    for (const auto& leak : leaks)
        report(leak);
}

// ---- Host-side API ----

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

#define HOST_LOCK std::lock_guard<std::recursive_mutex> hostLock(state_->mu)

Vm::Vm() : state_(std::make_unique<VmState>()) {}
Vm::~Vm() = default;
VmState& Vm::state() {
    return *state_;
}
JNIEnv* Vm::env() {
    return reinterpret_cast<JNIEnv*>(&state_->envOfThisThread());
}

void Vm::setViolationHandler(std::function<void(const std::string&)> handler) {
    std::lock_guard<std::mutex> g(state_->violationMu);
    state_->handler = std::move(handler);
}

std::vector<std::string> Vm::violations() const {
    std::lock_guard<std::mutex> g(state_->violationMu);
    return state_->violationList;
}

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

bool Vm::exceptionPending() {
    HOST_LOCK;
    return state_->envOfThisThread().pending != nullptr;
}

PendingException Vm::pendingException() {
    HOST_LOCK;
    Obj* e = state_->envOfThisThread().pending;
    if (!e)
        return {};
    const jobject msg = state_->field(e, "detailMessage").l;
    return {e->cls->name, msg ? utf8(objOf(msg)->chars) : std::string()};
}

void Vm::clearException() {
    HOST_LOCK;
    state_->envOfThisThread().pending = nullptr;
}

void Vm::failFindClass(const std::string& className) {
    HOST_LOCK;
    state_->failClass.insert(className);
}

void Vm::failMemberLookup(const std::string& className, const std::string& memberName) {
    HOST_LOCK;
    state_->failMember.emplace(className, memberName);
}

void Vm::failNewObject(const std::string& className) {
    HOST_LOCK;
    state_->failNew.insert(className);
}

void Vm::clearFailures() {
    HOST_LOCK;
    state_->failClass.clear();
    state_->failMember.clear();
    state_->failNew.clear();
}

int Vm::callCount(const std::string& functionName) const {
    for (int i = 0; i < kSlotCount; ++i) {
        if (functionName == kSlotNames[i])
            return state_->counts[i];
    }
    return 0;
}

int Vm::copyBackCount() const {
    return state_->copyBacks;
}

void Vm::resetCallCounts() {
    for (auto& c : state_->counts)
        c = 0;
    state_->copyBacks = 0;
}

// ---- Text ----

std::u16string utf16(const std::string& s) {
    std::u16string out(s.size(), u'\0');  // never more units than bytes
    const int n = MultiByteToWideChar(CP_UTF8, 0, s.data(), static_cast<int>(s.size()),
                                      reinterpret_cast<wchar_t*>(&out[0]), static_cast<int>(out.size()));
    out.resize(std::max(n, 0));
    return out;
}

std::string utf8(const std::u16string& s) {
    std::string out(s.size() * 3, '\0');  // a unit takes at most 3 bytes, a pair 4
    const int n = WideCharToMultiByte(CP_UTF8, 0, reinterpret_cast<const wchar_t*>(s.data()),
                                      static_cast<int>(s.size()), &out[0], static_cast<int>(out.size()),
                                      nullptr, nullptr);
    out.resize(std::max(n, 0));
    return out;
}

std::string toModifiedUtf8(const std::u16string& s) {
    std::string out;
    for (const char16_t u : s) {
        if (u != 0 && u < 0x80) {
            out += static_cast<char>(u);
        } else if (u < 0x800) {  // U+0000 too, as C0 80
            out += static_cast<char>(0xC0 | (u >> 6));
            out += static_cast<char>(0x80 | (u & 0x3F));
        } else {  // surrogates one by one
            out += static_cast<char>(0xE0 | (u >> 12));
            out += static_cast<char>(0x80 | ((u >> 6) & 0x3F));
            out += static_cast<char>(0x80 | (u & 0x3F));
        }
    }
    return out;
}

bool fromModifiedUtf8(const char* s, std::u16string& out) {
    bool wellFormed = true;
    for (auto p = reinterpret_cast<const unsigned char*>(s); *p;) {
        const int n = *p < 0x80 ? 1 : (*p >> 5) == 6 ? 2 : (*p >> 4) == 14 ? 3 : 0;  // no 4-byte forms
        char16_t u = *p & (n == 1 ? 0x7F : n == 2 ? 0x1F : 0x0F);
        bool ok = n > 0;
        for (int k = 1; ok && k < n; ++k) {
            ok = (p[k] & 0xC0) == 0x80;  // also stops at the terminator
            u = static_cast<char16_t>((u << 6) | (p[k] & 0x3F));
        }
        wellFormed = wellFormed && ok;
        out += ok ? u : u'\xFFFD';
        p += ok ? n : 1;
    }
    return wellFormed;
}

}  // namespace jnihost
