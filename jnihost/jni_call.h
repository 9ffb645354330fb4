// Shared by the files of the JNIEnv function table (jni_*.cpp): the guard every JNI function
// enters first, which checks the env (ours, its own thread, no exception pending unless JNI
// allows the function then), then its arguments, and reports each broken rule under the
// function's own name. Where the call can still be carried out safely it is, so that a test
// goes on and shows what follows.
#pragma once

#include <cstdarg>
#include <cstring>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "vm_state.h"

namespace jnihost {

inline bool allowedWhilePending(std::string_view n) {
    for (std::string_view a :
         {"ExceptionOccurred", "ExceptionCheck", "ExceptionClear", "ExceptionDescribe", "DeleteLocalRef",
          "DeleteGlobalRef", "PopLocalFrame", "PushLocalFrame", "EnsureLocalCapacity"}) {
        if (n == a)
            return true;
    }
    return n.substr(0, 7) == "Release";  // Release*Chars, Release*ArrayElements, Release*Critical
}

inline std::string memberName(const Member* m) {
    return m->owner->name + "." + m->name + m->sig;
}
inline char kindOf(const std::string& type) {
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

// Java's bounds rule for a region, computed without overflow; throws when broken.
inline bool inBounds(Call& c, size_t size, jsize start, jsize len, const char* exception) {
    if (start >= 0 && len >= 0 && start <= static_cast<jsize>(size) - len)
        return true;
    c.throwNew(exception, "Region " + std::to_string(start) + ".." + std::to_string(int64_t(start) + len) +
                              " out of bounds for length " + std::to_string(size));
    return false;
}

// Each file of JNI functions puts its own into the table (jni_table.cpp); a slot no file
// fills stays a trap. Assigned member by member, so that the compiler checks each signature
// against jni.h.
#define SLOT(fn) t.fn = fn
void fillClassSlots(JNINativeInterface_& t);
void fillObjectSlots(JNINativeInterface_& t);
void fillCallSlots(JNINativeInterface_& t);
void fillStringSlots(JNINativeInterface_& t);
void fillArraySlots(JNINativeInterface_& t);

}  // namespace jnihost
