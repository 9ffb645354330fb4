// The JNI host itself: a host that missed a broken rule would hide that fault in every other
// test, so each test here breaks rules on purpose and expects the host to catch them.
#include <windows.h>

#include <climits>
#include <string>
#include <thread>

#include "jnihost.h"
#include "violation_log.h"

// A native of this program's own, called through its export as the library's are: it takes
// a string's UTF-8 block and never gives it back.
extern "C" __attribute__((dllexport)) void JNICALL leakUtfChars(JNIEnv* env, jclass, jstring s) {
    env->GetStringUTFChars(s, nullptr);
}

// Two forms of one overloaded native, exported under their JNI long names as the 64-bit
// library exports its byte counts.
extern "C" __attribute__((dllexport)) jint JNICALL Java_jnihost_Counts_count__(JNIEnv*, jclass) {
    return 1;
}
extern "C" __attribute__((dllexport)) jint JNICALL Java_jnihost_Counts_count___3B(JNIEnv*, jclass,
                                                                                  jbyteArray) {
    return 2;
}

namespace {

class Host : public ::testing::Test {
protected:
    // The pending exception's class, cleared.
    std::string takeException() {
        const std::string name = vm.pendingException().className;
        vm.clearException();
        return name;
    }

    jnihost::Vm vm;
    JNIEnv* env = vm.env();
    ViolationLog log{vm};
};

TEST_F(Host, StringsCrossAsModifiedUtf8BothWaysAndOtherUtf8IsReported) {
    jstring s = vm.newString(std::u16string(u"a\0b\U0001F600", 5));
    const char* utf = env->GetStringUTFChars(s, nullptr);
    // NUL as C0 80, the surrogate pair as two 3-byte units.
    EXPECT_STREQ(utf,
                 "a\xC0\x80"
                 "b\xED\xA0\xBD\xED\xB8\x80");
    EXPECT_EQ(env->GetStringUTFLength(s), 10);
    EXPECT_EQ(vm.stringValue(env->NewStringUTF(utf)), vm.stringValue(s));
    env->ReleaseStringUTFChars(s, utf);
    EXPECT_TRUE(log.none());

    env->NewStringUTF("caf\xE9");  // ANSI text
    EXPECT_TRUE(log.reported("NewStringUTF: \"caf\\xE9\" is not modified UTF-8"));
    env->NewStringUTF("\xF0\x9F\x98\x80");  // standard UTF-8's 4-byte form
    EXPECT_TRUE(log.reported("not modified UTF-8"));
}

TEST_F(Host, EveryBlockIsReleasedOnceByItsOwnFunctionForItsOwnObject) {
    jstring s = vm.newString(u"text"), other = vm.newString(u"other");
    const jchar* chars = env->GetStringChars(s, nullptr);
    env->ReleaseStringUTFChars(s, reinterpret_cast<const char*>(chars));
    EXPECT_TRUE(log.reported("ReleaseStringUTFChars: releases a block taken by GetStringChars"));
    env->ReleaseStringChars(s, chars);
    EXPECT_TRUE(log.reported("was released already by ReleaseStringUTFChars"));
    const char* utf = env->GetStringUTFChars(s, nullptr);
    env->ReleaseStringUTFChars(other, utf);
    EXPECT_TRUE(log.reported("released against java/lang/String \"other\""));
    const char never[] = "x";
    env->ReleaseStringUTFChars(s, never);
    EXPECT_TRUE(log.reported("was never handed out"));
}

TEST_F(Host, RegionCallsOutsideTheArrayThrowAndTouchNothing) {
    jbyteArray a = vm.newByteArray({1, 2, 3});
    jbyte buf[4] = {5, 5, 5, 5};
    const std::pair<jsize, jsize> outside[] = {{2, 2}, {-1, 1}, {0, -1}, {INT_MAX, 2}, {4, 0}};
    for (const auto& [start, len] : outside) {
        env->GetByteArrayRegion(a, start, len, buf);
        EXPECT_EQ(takeException(), "java/lang/ArrayIndexOutOfBoundsException") << start << "+" << len;
        env->SetByteArrayRegion(a, start, len, buf);
        EXPECT_EQ(takeException(), "java/lang/ArrayIndexOutOfBoundsException") << start << "+" << len;
    }
    EXPECT_EQ(buf[0], 5);
    EXPECT_EQ(vm.byteArrayValue(a), (std::vector<uint8_t>{1, 2, 3}));
    env->GetByteArrayRegion(a, 3, 0, buf);  // empty, at the very end: inside
    EXPECT_FALSE(vm.exceptionPending());
    EXPECT_TRUE(log.none());
}

TEST_F(Host, FailedLookupsAndInjectedFailuresThrowJavasErrors) {
    EXPECT_EQ(env->FindClass("java/lang/Nope"), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoClassDefFoundError");
    vm.failFindClass("java/lang/Integer");
    EXPECT_EQ(env->FindClass("java/lang/Integer"), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoClassDefFoundError");
    vm.clearFailures();
    vm.failMemberLookup("java/lang/Integer", "intValue");
    EXPECT_EQ(env->GetMethodID(env->FindClass("java/lang/Integer"), "intValue", "()I"), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoSuchMethodError");
    vm.failNewObject("java/lang/String");
    EXPECT_EQ(env->NewStringUTF("x"), nullptr);
    EXPECT_EQ(takeException(), "java/lang/OutOfMemoryError");
    vm.clearFailures();
    EXPECT_NE(env->NewStringUTF("x"), nullptr) << "injected failures end with clearFailures";
    EXPECT_TRUE(log.none());
}

TEST_F(Host, CallsWithAnExceptionPendingAreReported) {
    env->ThrowNew(env->FindClass(jnihost::kCoreUtilException), "boom");
    EXPECT_NE(env->FindClass("java/lang/String"), nullptr) << "still carried out";
    EXPECT_TRUE(log.reported("FindClass: called with an exception pending (" +
                             std::string(jnihost::kCoreUtilException) + ": boom)"));
    EXPECT_TRUE(env->ExceptionCheck());
    env->ExceptionClear();
    EXPECT_TRUE(log.none()) << "both allowed while pending";
}

// Calls through exports: kernel32's SetLastError pops the one slot it is given (the env), and
// on x86 GetTickCount pops none, as an export with a wrong @N would (x64 has no stdcall: the
// caller owns the stack); this program's own leaking native is reported when it returns.
TEST_F(Host, ExportCallsReportWrongStackSizeMissingExportsAndLeakedBlocks) {
    jnihost::Library kernel(vm, "kernel32.dll");
    kernel.call<void>("SetLastError");
    EXPECT_EQ(GetLastError(), static_cast<DWORD>(reinterpret_cast<uintptr_t>(env)));
    EXPECT_TRUE(log.none());
#if !defined(_WIN64)
    kernel.call<uint32_t>("GetTickCount");
    EXPECT_TRUE(log.reported("GetTickCount: stack imbalance of -4 bytes"));
#endif
    kernel.call<void>("_Java_nothing@8");
    EXPECT_TRUE(log.reported("_Java_nothing@8: no such export"));

    char self[MAX_PATH];
    ASSERT_GT(GetModuleFileNameA(nullptr, self, sizeof self), 0u);
    jnihost::Library program(vm, self);
    program.call<void>("leakUtfChars@12", jclass{}, vm.newString(u"kept"));
    EXPECT_TRUE(
        log.reported("leakUtfChars@12: GetStringUTFChars of java/lang/String \"kept\" never released"));
}

#if defined(_WIN64)
// A 64-bit JVM tries a native's plain short name, then its long name: the 32-bit names the
// tests use bind to the long-named forms, the no-argument form to name__.
TEST_F(Host, X64LookupFallsBackToTheLongNameAsAJvmDoes) {
    char self[MAX_PATH];
    ASSERT_GT(GetModuleFileNameA(nullptr, self, sizeof self), 0u);
    jnihost::Library program(vm, self);
    EXPECT_EQ(program.call<jint>("_Java_jnihost_Counts_count@8", jclass{}), 1);
    EXPECT_EQ(program.call<jint>("_Java_jnihost_Counts_count___3B@12", jclass{}, vm.newByteArray({})), 2);
    EXPECT_EQ(program.call<jint>("_Java_jnihost_Counts_count@12", jclass{}, vm.newByteArray({})), 0);
    EXPECT_TRUE(log.reported("_Java_jnihost_Counts_count@12: no such export"))
        << "a form with arguments has no short name to fall back from";
}
#endif

TEST_F(Host, MisusedEnvsAndObjectsAreReported) {
    // The choosers' dialogs call back on one thread while Java calls in from another: each
    // thread must use its own env.
    std::thread([&] { env->FindClass("java/lang/String"); }).join();
    EXPECT_TRUE(log.reported("used on thread"));

    env->GetStringLength(nullptr);
    EXPECT_TRUE(log.reported("GetStringLength: null"));
    env->GetStringChars(reinterpret_cast<jstring>(vm.newByteArray({1, 2})), nullptr);
    EXPECT_TRUE(log.reported("GetStringChars"));
    jclass chooser = env->FindClass(jnihost::kFileChooserClass);
    jfieldID hwnd = env->GetFieldID(chooser, "hwnd", "J");
    env->GetIntField(vm.newInstance(jnihost::kFileChooserClass), hwnd);
    EXPECT_TRUE(log.reported("GetIntField"));
}

}  // namespace
