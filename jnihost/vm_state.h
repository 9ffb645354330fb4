// Internals of the JNI host shared by its host side (vm_*.cpp, host_*.cpp, library.cpp) and
// the JNIEnv function table (jni_*.cpp). Tests use jnihost.h only.
#pragma once

#include "jnihost.h"

#include <array>
#include <atomic>
#include <deque>
#include <map>
#include <mutex>
#include <set>
#include <string_view>
#include <unordered_set>

namespace jnihost {

inline constexpr const char* kSlotNames[] = {
#include "jni_slot_names.inc"
};
inline constexpr int kSlotCount = static_cast<int>(sizeof kSlotNames / sizeof kSlotNames[0]);
// -1 for a name that is not a slot; constexpr so that a misspelt name fails to compile.
constexpr int slotOf(std::string_view name) {
    for (int i = 0; i < kSlotCount; ++i) {
        if (name == kSlotNames[i])
            return i;
    }
    return -1;
}

struct ClassRec;
struct Obj;
struct HostEnv;
struct VmState;

// What a method implementation may use. It releases `lock` while it runs test code (a
// validator), which makes JNI calls of its own and may wait for other threads.
struct Ctx {
    VmState& vm;
    HostEnv& env;
    std::unique_lock<std::recursive_mutex>& lock;
    const char* function;  // the JNI function making the call, for messages
};
using MethodImpl = jvalue (*)(Ctx& c, Obj* self, const jvalue* args);

// A method or field; a jmethodID / jfieldID points at one.
struct Member {
    ClassRec* owner;
    std::string name;
    std::string sig;
    bool isField;
    MethodImpl impl;  // null for fields
};

struct ClassRec {
    std::string name;
    ClassRec* super = nullptr;
    std::vector<ClassRec*> interfaces;
    bool isInterface = false;
    ClassRec* element = nullptr;  // of an object array class
    std::vector<std::unique_ptr<Member>> members;
    Obj* mirror = nullptr;  // the java/lang/Class object a jclass refers to
};

// One Java object; only the parts its class uses are filled.
struct Obj {
    ClassRec* cls;
    ClassRec* asClass = nullptr;                         // java/lang/Class: the class it stands for
    std::u16string chars;                                // java/lang/String
    std::vector<jbyte> bytes;                            // [B
    std::vector<Obj*> elems;                             // object arrays; enumerator snapshot
    std::vector<std::pair<Obj*, Obj*>> entries;          // java/util/Hashtable, in insertion order
    std::unordered_multimap<size_t, size_t> entryIndex;  // key hash -> position in entries
    size_t cursor = 0;                                   // enumerator position
    jint intValue = 0;                                   // java/lang/Integer
    std::map<const Member*, jvalue> fields;
    ValidatorFn validator;
};

enum class BlockKind { StringChars, StringUtfChars, StringCritical, ByteElements, ArrayCritical };

// A copy handed out by a Get*Chars / Get*Elements / Get*Critical function.
struct Block {
    BlockKind kind;
    Obj* owner;
    const char* takenBy;
    unsigned long thread;
    uint64_t serial;
    size_t size;  // payload bytes, without the terminator
    std::unique_ptr<char[]> data;
    const char* releasedBy = nullptr;
};

// What JNIEnv* points at. `functions` must stay first: jni.h's JNIEnv_ is that one pointer.
struct HostEnv {
    const JNINativeInterface_* functions;
    VmState* vm;
    unsigned long thread;
    Obj* pending = nullptr;
};

const JNINativeInterface_* functionTable();

// Live envs and Vms: a JNIEnv pointer is checked against them before it is used.
struct Registry {
    std::mutex mu;
    std::unordered_set<const void*> envs;
    std::vector<VmState*> vms;
};
Registry& registry();
// The host env behind a JNIEnv pointer, or null when it is not a live env of any Vm.
HostEnv* lookupEnv(const void* env);
// A JNI function got an env that is not ours: reported to the newest Vm (or stderr).
void reportUnknownEnv(const void* env, const char* function);

struct VmState {
    VmState();
    ~VmState();

    mutable std::recursive_mutex mu;  // recursive: a violation handler may use the Vm
    std::vector<std::unique_ptr<Obj>> objects;
    std::unordered_set<const Obj*> live;
    std::map<std::string, std::unique_ptr<ClassRec>> classes;
    std::unordered_set<const Member*> members;
    std::map<unsigned long, std::unique_ptr<HostEnv>> envs;

    std::map<const void*, Block> blocks;
    std::deque<Block> released;  // kept a while, so that a second release is told apart
    uint64_t nextSerial = 1;

    std::set<std::string> failClass, failNew;
    std::set<std::pair<std::string, std::string>> failMember;
    std::array<std::atomic<int>, kSlotCount> counts{};
    std::atomic<int> copyBacks{0};  // element releases that copied the block into the array

    mutable std::mutex violationMu;
    std::vector<std::string> violationList;
    std::function<void(const std::string&)> handler;

    ClassRec* cClass = nullptr;  // defineClass makes mirrors once java/lang/Class exists
    ClassRec *cObject, *cString, *cInteger, *cThrowable, *cByteArray, *cPoint, *cHashtable, *cEnumerator,
        *cValidatorImpl;
    const Member* detailMessage;

    void report(const std::string& msg);
    HostEnv& envOfThisThread();
    // After a Library call: the blocks taken on this thread since `serial` are leaks.
    void afterCall(const char* exportName, unsigned long thread, uint64_t serial);

    ClassRec* defineClass(const std::string& name, ClassRec* super, bool isInterface = false,
                          std::vector<ClassRec*> interfaces = {});
    void addMember(ClassRec* c, const std::string& name, const std::string& sig, MethodImpl impl = nullptr);
    ClassRec* findClass(const std::string& name);  // also array classes of known classes
    ClassRec* arrayOf(ClassRec* element);
    ClassRec* classOfType(const std::string& type);  // "Ljava/lang/String;", "[B"; null if primitive
    const Member* findMember(const ClassRec* c, const std::string& name, const std::string& sig,
                             bool field) const;
    const Member* fieldByName(const ClassRec* c, const std::string& name) const;
    bool isA(const ClassRec* c, const ClassRec* target) const;

    Obj* make(ClassRec* c);
    Obj* makeString(std::u16string chars);
    Obj* resolve(const void* handle) const;  // null unless a live object of this Vm
    jvalue& field(Obj* o, const char* name) { return o->fields[fieldByName(o->cls, name)]; }
    Obj* hashtableGet(Obj* table, Obj* key) const;
    Obj* hashtablePut(Obj* table, Obj* key, Obj* value);  // the previous value
    void throwNew(HostEnv& env, const std::string& className, const std::u16string& message,
                  bool nullMessage = false);
    std::string describe(const Obj* o) const;  // for messages: class and value
};

inline jobject handle(const Obj* o) {
    return reinterpret_cast<jobject>(const_cast<Obj*>(o));
}
inline Obj* objOf(jobject validated) {
    return reinterpret_cast<Obj*>(validated);
}
inline jvalue jv(jint i) {
    jvalue v{};
    v.i = i;
    return v;
}
inline jvalue jv(const Obj* o) {
    jvalue v{};
    v.l = handle(o);
    return v;
}

// Every host-side API function that touches the Vm's objects holds its lock.
#define HOST_LOCK std::lock_guard<std::recursive_mutex> hostLock(state_->mu)

std::string hex(const void* p);
// Here so that the JNI function table need not include <windows.h>, whose names clash.
unsigned long currentThreadId();
[[noreturn]] void terminateProcess(unsigned exitCode);

}  // namespace jnihost
