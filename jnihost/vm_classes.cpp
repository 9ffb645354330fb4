// The classes the host knows, with their members and method implementations, and the
// lookups of classes and members.
#include <pthread.h>

#include <algorithm>

#include "vm_state.h"

namespace jnihost {

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

}  // namespace jnihost
