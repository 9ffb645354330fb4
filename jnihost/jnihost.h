// A strict JNI host: a stand-in for the Java virtual machine that loads libTessel_JNI.dll
// through its real exports (decorated on x86, plain on x64) and checks the JNI rules the way -Xcheck:jni
// does. Used by the tests, the tour and the benchmarks.
//
// Objects live as long as the Vm; a jobject is a handle to one of them. Every thread that
// calls env() gets its own JNIEnv, and using an env on another thread is a violation.
// Violations go to the violation handler (tests turn them into test failures); a call to a
// JNI function the library is not expected to use is reported and ends the process.
#pragma once

#include <jni.h>

#include <cstdint>
#include <cstring>
#include <type_traits>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace jnihost {

struct VmState;

// The application classes the host knows, with their fields.
inline constexpr const char* kPointClass = "java/awt/Point";
inline constexpr const char* kPointSubclass = "jnihost/TestPoint";  // extends java/awt/Point
inline constexpr const char* kFileChooserClass = "com/velmor/coreutil/hack/HackWindowsFileChooser";
inline constexpr const char* kDirectoryChooserClass = "com/velmor/coreutil/hack/HackWindowsDirectoryChooser";
inline constexpr const char* kValidatorInterface = "com/velmor/coreutil/hack/HackWindowsDirectoryValidator";
inline constexpr const char* kCoreUtilException = "com/velmor/coreutil/exception/CoreUtilException";

// Behaviour of a Java HackWindowsDirectoryValidator. It runs on the thread that calls
// "validateDirectory", gets that thread's env and the path; it may throw a Java exception
// through env->ThrowNew. After a throw, the value CallBooleanMethod gives is undefined in
// JNI: the host gives the function's result unchanged, never a convenient false.
using ValidatorFn = std::function<bool(JNIEnv* env, const std::string& pathUtf8)>;

// A pending Java exception, as seen from the host.
struct PendingException {
    std::string className;  // e.g. "java/lang/NoSuchMethodError"
    std::string message;    // UTF-8
};

class Vm {
public:
    // Loads no DLL; see Library below.
    Vm();
    ~Vm();
    Vm(const Vm&) = delete;
    Vm& operator=(const Vm&) = delete;

    // The JNIEnv of the calling thread (made on first use).
    JNIEnv* env();

    // Violations: each broken rule calls the handler with a description. The default
    // handler prints to stderr and counts; violations() returns all seen so far.
    void setViolationHandler(std::function<void(const std::string&)> handler);
    std::vector<std::string> violations() const;

    // ---- Making and reading Java values (host side, any thread, never a JNI call) ----
    jstring newString(const std::u16string& text);
    jstring newStringUtf8(const std::string& utf8);  // standard UTF-8 in, UTF-16 inside
    std::u16string stringValue(jobject s);           // s must be a java/lang/String
    std::string stringUtf8(jobject s);               // standard UTF-8 (surrogate pairs joined)

    jbyteArray newByteArray(const std::vector<uint8_t>& bytes);
    std::vector<uint8_t> byteArrayValue(jobject array);

    jobjectArray newStringArray(const std::vector<jobject>& elements);  // elements may be null
    std::vector<jobject> objectArrayValue(jobject array);

    jobject newInteger(int32_t value);
    int32_t integerValue(jobject integer);

    jobject newPoint(int32_t x, int32_t y, bool subclass = false);
    std::pair<int32_t, int32_t> pointValue(jobject point);

    jobject newHashtable();
    void hashtablePut(jobject table, jobject key, jobject value);  // equals/hashCode as Java
    // A table that breaks Hashtable's contract (as a subclass overriding put could): the
    // entry's value is null, and get gives null for its key.
    void hashtablePutNullValue(jobject table, jobject key);
    jobject hashtableGet(jobject table, jobject key);  // null when absent
    std::vector<std::pair<jobject, jobject>> hashtableEntries(jobject table);

    // A plain java/lang/Object (neither String, Integer nor byte[]).
    jobject newPlainObject();

    // An instance of one of the application classes above, or of java/lang/Long or
    // java/lang/Double (no value: only their class matters to the library), fields zero/null.
    jobject newInstance(const char* className);
    jobject newValidator(ValidatorFn fn);

    // Field access by name on any object (host side, thread-safe).
    void setLongField(jobject obj, const char* name, int64_t value);
    int64_t longField(jobject obj, const char* name);
    void setObjectField(jobject obj, const char* name, jobject value);
    jobject objectField(jobject obj, const char* name);

    // The class name of an object ("java/lang/String", "[B", ...).
    std::string classNameOf(jobject obj);

    // ---- Pending exception of the calling thread ----
    bool exceptionPending();
    PendingException pendingException();  // empty names when none
    void clearException();

    // ---- Failure injection (all threads; cleared by clearFailures) ----
    void failFindClass(const std::string& className);
    // Member lookups: GetMethodID/GetStaticMethodID/GetFieldID of that name on that class.
    void failMemberLookup(const std::string& className, const std::string& memberName);
    // NewObject*/AllocObject/NewObjectArray/NewString*/NewByteArray of that class ("java/lang/String",
    // "[B" ...); for NewObjectArray the array's class ("[Ljava/lang/String;"), not its element's.
    void failNewObject(const std::string& className);
    void clearFailures();

    // ---- Counters for tests ----
    // How many times a JNI function was called on any env, by its jni.h name ("FindClass").
    int callCount(const std::string& functionName) const;
    // How many array element releases copied the elements back (mode 0 or JNI_COMMIT).
    int copyBackCount() const;
    void resetCallCounts();

    VmState& state();

private:
    std::unique_ptr<VmState> state_;
};

// The library under test, loaded with LoadLibraryA and called through its exports. Callers
// name an export as a 32-bit JVM finds it ("_Java_..._getCursorPos@8"); a 64-bit host looks
// it up as a 64-bit JVM does (exportNameFor).
class Library {
public:
    explicit Library(Vm& vm, const char* path = "libTessel_JNI.dll");
    ~Library();
    Library(const Library&) = delete;
    Library& operator=(const Library&) = delete;

    void* handle() const { return module_; }
    // GetProcAddress of the exact name; null when missing.
    void* find(const char* exportName) const;

    // Calls an export as a JNI function of the given result type with the calling thread's
    // env first and then args (jobject/jclass, jint, jboolean, jlong, references).
    // Checks: the export exists, on x86 the stack is balanced after the call (the __stdcall
    // callee popped exactly the bytes the arguments took), and every string and array
    // element block taken during the call was released exactly once. Failures go to the
    // violation handler.
    template <class R, class... A>
    R call(const char* exportName, A... args);

private:
    uint64_t invoke(const char* exportName, const uintptr_t* slots, int slotCount);

    Vm& vm_;
    void* module_ = nullptr;
};

// The name a JVM of this host's architecture binds a native to, given its 32-bit name: on
// x86 the name itself; on x64 the name without the leading underscore of "_Java_" and
// without "@N", or, for a native without Java arguments whose plain name is not exported,
// its JNI long name (name + "__"), the JVM's second try. Null when neither is exported.
const char* exportNameFor(void* module, const char* x86Name, int javaArgCount, std::string* storage);

namespace detail {
// One argument in the native width of the calling convention: 4-byte stack slots on x86
// (a jlong takes two), one 8-byte slot or register per argument on x64. Signed values are
// sign-extended, as a JVM passes them.
template <class T>
void pushSlots(std::vector<uintptr_t>& slots, T value) {
    static_assert(sizeof(T) == 4 || sizeof(T) == 8 || sizeof(T) == 1, "JNI argument width");
    static_assert(!std::is_floating_point_v<T>, "no native of the library takes a float or double");
    if constexpr (std::is_pointer_v<T>) {
        slots.push_back(reinterpret_cast<uintptr_t>(value));
    } else if constexpr (sizeof(T) > sizeof(uintptr_t)) {
        const auto v = static_cast<uint64_t>(value);
        slots.push_back(static_cast<uintptr_t>(v));
        slots.push_back(static_cast<uintptr_t>(v >> 32));
    } else if constexpr (std::is_signed_v<T>) {
        slots.push_back(static_cast<uintptr_t>(static_cast<intptr_t>(value)));
    } else {
        slots.push_back(static_cast<uintptr_t>(value));  // jboolean widened to a slot
    }
}
}  // namespace detail

template <class R, class... A>
R Library::call(const char* exportName, A... args) {
    std::vector<uintptr_t> slots;
    detail::pushSlots(slots, vm_.env());
    (detail::pushSlots(slots, args), ...);
    const uint64_t raw = invoke(exportName, slots.data(), static_cast<int>(slots.size()));
    if constexpr (std::is_void_v<R>) {
        (void)raw;
    } else if constexpr (sizeof(R) == 8) {
        R r;
        std::memcpy(&r, &raw, 8);
        return r;
    } else {
        const uint32_t low = static_cast<uint32_t>(raw);
        R r;
        std::memcpy(&r, &low, sizeof(R));  // little-endian: the low bytes of EAX
        return r;
    }
}

// UTF-8 <-> UTF-16 helpers for tests.
std::u16string utf16(const std::string& utf8);
std::string utf8(const std::u16string& text);
// Modified UTF-8 as JNI uses it (U+0000 as C0 80, surrogates encoded one by one).
std::string toModifiedUtf8(const std::u16string& s);
// False when the bytes are not well-formed modified UTF-8; bad bytes then become U+FFFD.
bool fromModifiedUtf8(const char* s, std::u16string& out);

}  // namespace jnihost
