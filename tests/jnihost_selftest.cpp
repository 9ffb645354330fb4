// The JNI host itself: the few behaviours every other test relies on it to get right.
#include <windows.h>

#include <gtest/gtest.h>

#include <climits>
#include <thread>

#include "jnihost.h"

namespace {

using jnihost::Vm;

class Host : public ::testing::Test {
protected:
    Host() {
        vm.setViolationHandler([this](const std::string& what) { seen.push_back(what); });
    }
    // The violations reported since the last call.
    std::vector<std::string> taken() { return std::exchange(seen, {}); }
    ::testing::AssertionResult reported(const std::string& fragment) {
        const auto all = taken();
        for (const auto& v : all) {
            if (v.find(fragment) != std::string::npos)
                return ::testing::AssertionSuccess();
        }
        auto failure = ::testing::AssertionFailure() << "no violation mentions \"" << fragment << "\"; got:";
        for (const auto& v : all)
            failure << "\n  " << v;
        return failure;
    }
    std::string takeException() {
        const std::string name = vm.pendingException().className;
        vm.clearException();
        return name;
    }
    jmethodID method(const char* cls, const char* name, const char* sig) {
        return env->GetMethodID(env->FindClass(cls), name, sig);
    }

    Vm vm;
    JNIEnv* env = vm.env();
    std::vector<std::string> seen;
};

TEST_F(Host, StringsCrossAsModifiedUtf8) {
    jstring s = vm.newString(std::u16string(u"a\0b\U0001F600", 5));
    const char* utf = env->GetStringUTFChars(s, nullptr);
    EXPECT_STREQ(utf,
                 "a\xC0\x80"
                 "b\xED\xA0\xBD\xED\xB8\x80");
    EXPECT_EQ(env->GetStringUTFLength(s), 10);
    EXPECT_EQ(vm.stringValue(env->NewStringUTF(utf)), vm.stringValue(s));
    env->ReleaseStringUTFChars(s, utf);
    EXPECT_EQ(vm.stringUtf8(s), std::string("a\0b\xF0\x9F\x98\x80", 7));
    EXPECT_TRUE(taken().empty());

    env->NewStringUTF("caf\xE9");  // ANSI text
    EXPECT_TRUE(reported("NewStringUTF: \"caf\\xE9\" is not modified UTF-8"));
    env->NewStringUTF("\xF0\x9F\x98\x80");  // standard UTF-8's 4-byte form
    EXPECT_TRUE(reported("not modified UTF-8"));
}

TEST_F(Host, EveryBlockIsReleasedOnceByItsOwnFunctionForItsOwnObject) {
    jstring s = vm.newString(u"text"), other = vm.newString(u"other");
    const jchar* chars = env->GetStringChars(s, nullptr);
    env->ReleaseStringUTFChars(s, reinterpret_cast<const char*>(chars));
    EXPECT_TRUE(reported("ReleaseStringUTFChars: releases a block taken by GetStringChars"));
    env->ReleaseStringChars(s, chars);
    EXPECT_TRUE(reported("was released already by ReleaseStringUTFChars"));

    const char* utf = env->GetStringUTFChars(s, nullptr);
    env->ReleaseStringUTFChars(other, utf);
    EXPECT_TRUE(reported("released against java/lang/String \"other\""));
    const char never[] = "x";
    env->ReleaseStringUTFChars(s, never);
    EXPECT_TRUE(reported("was never handed out"));
}

TEST_F(Host, ByteArrayElementsAreCopiesAndRegionsAreBoundsChecked) {
    jbyteArray a = vm.newByteArray({1, 2, 3});
    jboolean isCopy = JNI_FALSE;
    jbyte* e = env->GetByteArrayElements(a, &isCopy);
    EXPECT_EQ(isCopy, JNI_TRUE);
    e[0] = 9;
    EXPECT_EQ(vm.byteArrayValue(a), (std::vector<uint8_t>{1, 2, 3})) << "a copy until released";
    env->ReleaseByteArrayElements(a, e, JNI_COMMIT);
    e[1] = 8;
    env->ReleaseByteArrayElements(a, e, JNI_ABORT);
    EXPECT_EQ(vm.byteArrayValue(a), (std::vector<uint8_t>{9, 2, 3}));
    e = env->GetByteArrayElements(a, nullptr);
    e[2] = 7;
    env->ReleaseByteArrayElements(a, e, 0);
    EXPECT_EQ(vm.byteArrayValue(a), (std::vector<uint8_t>{9, 2, 7}));
    EXPECT_TRUE(taken().empty());

    jbyte buf[4] = {5, 5, 5, 5};
    const std::pair<jsize, jsize> outside[] = {{2, 2}, {-1, 1}, {0, -1}, {INT_MAX, 2}, {4, 0}};
    for (const auto& [start, len] : outside) {
        env->GetByteArrayRegion(a, start, len, buf);
        EXPECT_EQ(takeException(), "java/lang/ArrayIndexOutOfBoundsException") << start << "+" << len;
        env->SetByteArrayRegion(a, start, len, buf);
        EXPECT_EQ(takeException(), "java/lang/ArrayIndexOutOfBoundsException") << start << "+" << len;
    }
    EXPECT_EQ(buf[0], 5);
    EXPECT_EQ(vm.byteArrayValue(a), (std::vector<uint8_t>{9, 2, 7}));
    EXPECT_TRUE(taken().empty());
}

TEST_F(Host, HashtableBehavesAsJavas) {
    const char* table = "java/util/Hashtable";
    jmethodID put = method(table, "put", "(Ljava/lang/Object;Ljava/lang/Object;)Ljava/lang/Object;");
    jmethodID keys = method(table, "keys", "()Ljava/util/Enumeration;");
    jmethodID next = method("java/util/Enumeration", "nextElement", "()Ljava/lang/Object;");
    jobject t = env->NewObject(env->FindClass(table), method(table, "<init>", "()V"));
    EXPECT_EQ(env->CallObjectMethod(t, put, vm.newString(u"k"), vm.newInteger(1)), nullptr);
    jobject previous = env->CallObjectMethod(t, put, vm.newString(u"k"), vm.newInteger(2));
    EXPECT_EQ(vm.integerValue(previous), 1) << "String keys compare by content";
    env->CallObjectMethod(t, put, vm.newInteger(5), vm.newPlainObject());
    EXPECT_NE(vm.hashtableGet(t, vm.newInteger(5)), nullptr) << "Integer keys compare by value";
    env->CallObjectMethod(t, put, vm.newPlainObject(), vm.newPlainObject());
    EXPECT_EQ(env->CallIntMethod(t, method(table, "size", "()I")), 3) << "other keys by identity";

    env->CallObjectMethod(t, put, nullptr, vm.newPlainObject());
    EXPECT_EQ(takeException(), "java/lang/NullPointerException");
    jobject e = env->CallObjectMethod(t, keys);
    for (int i = 0; i < 3; ++i)
        EXPECT_NE(env->CallObjectMethod(e, next), nullptr);
    EXPECT_EQ(env->CallObjectMethod(e, next), nullptr);
    EXPECT_EQ(takeException(), "java/util/NoSuchElementException");
    EXPECT_TRUE(taken().empty());
}

TEST_F(Host, LookupsFollowTheHierarchyAndFailWithJavasErrors) {
    jobject sub = vm.newPoint(3, 4, true);
    jfieldID baseX = env->GetFieldID(env->FindClass(jnihost::kPointClass), "x", "I");
    EXPECT_EQ(env->GetFieldID(env->FindClass(jnihost::kPointSubclass), "x", "I"), baseX);
    EXPECT_EQ(env->GetIntField(sub, baseX), 3);
    EXPECT_TRUE(env->IsInstanceOf(sub, env->FindClass("java/lang/Object")));
    EXPECT_FALSE(
        env->IsAssignableFrom(env->FindClass("java/lang/Object"), env->FindClass("java/lang/String")));

    EXPECT_EQ(env->FindClass("java/lang/Nope"), nullptr);
    EXPECT_EQ(vm.pendingException().message, "java/lang/Nope");
    EXPECT_EQ(takeException(), "java/lang/NoClassDefFoundError");
    EXPECT_EQ(env->GetFieldID(env->FindClass(jnihost::kPointClass), "x", "J"), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoSuchFieldError");
    vm.failMemberLookup("java/lang/Integer", "intValue");
    EXPECT_EQ(method("java/lang/Integer", "intValue", "()I"), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoSuchMethodError");
    vm.failNewObject("java/lang/String");
    EXPECT_EQ(env->NewStringUTF("x"), nullptr);
    EXPECT_EQ(takeException(), "java/lang/OutOfMemoryError");
    EXPECT_TRUE(taken().empty());
}

TEST_F(Host, BrokenRulesAreReportedUnderTheFunctionsName) {
    env->ThrowNew(env->FindClass(jnihost::kCoreUtilException), "boom");
    EXPECT_NE(env->FindClass("java/lang/String"), nullptr) << "still carried out";
    EXPECT_TRUE(reported("FindClass: called with an exception pending (" +
                         std::string(jnihost::kCoreUtilException) + ": boom)"));
    EXPECT_TRUE(env->ExceptionCheck());
    env->ExceptionClear();
    EXPECT_TRUE(taken().empty()) << "both allowed while pending";

    jobject chooser = vm.newInstance(jnihost::kFileChooserClass);
    jfieldID hwnd = env->GetFieldID(env->FindClass(jnihost::kFileChooserClass), "hwnd", "J");
    env->GetIntField(chooser, hwnd);
    EXPECT_TRUE(reported("GetIntField: field " + std::string(jnihost::kFileChooserClass) +
                         ".hwndJ is not of type I"));
    env->GetLongField(vm.newPoint(1, 2), hwnd);
    EXPECT_TRUE(reported("GetLongField: field"));
    env->GetStringLength(reinterpret_cast<jstring>(vm.newByteArray({1})));
    EXPECT_TRUE(reported("GetStringLength: string is [B of length 1, not a java/lang/String"));

    JNIEnv notOurs{env->functions};
    notOurs.GetVersion();
    EXPECT_TRUE(reported("GetVersion: JNIEnv"));
    Vm other;
    env->GetStringLength(other.newString(u"elsewhere"));
    EXPECT_TRUE(reported("is not a live object of this Vm"));
    env->GetStringLength(nullptr);
    EXPECT_TRUE(reported("GetStringLength: null string"));
    std::thread([&] { env->GetVersion(); }).join();
    EXPECT_TRUE(reported("GetVersion: JNIEnv of thread"));
    other.env()->GetVersion();
    EXPECT_TRUE(taken().empty()) << "the other Vm's env is its own";
}

TEST_F(Host, ValidatorAnswersUnlessItThrew) {
    jmethodID validate = method(jnihost::kValidatorInterface, "validateDirectory", "(Ljava/lang/String;)Z");
    JNIEnv* seenEnv = nullptr;
    jobject validator = vm.newValidator([&](JNIEnv* e, const std::string& path) {
        seenEnv = e;
        if (path == "throw")
            e->ThrowNew(e->FindClass(jnihost::kCoreUtilException), "refused");
        return path != "no";
    });
    EXPECT_EQ(env->CallBooleanMethod(validator, validate, vm.newString(u"yes")), JNI_TRUE);
    EXPECT_EQ(seenEnv, env);
    EXPECT_EQ(env->CallBooleanMethod(validator, validate, vm.newString(u"no")), JNI_FALSE);
    EXPECT_EQ(env->CallBooleanMethod(validator, validate, vm.newString(u"throw")), JNI_FALSE);
    EXPECT_EQ(takeException(), jnihost::kCoreUtilException);
    EXPECT_TRUE(taken().empty());
}

// The call thunk, against kernel32 exports of known size: SetLastError pops the one slot
// (the env) it is given, GetTickCount pops none.
TEST_F(Host, LibraryReportsStackImbalanceAndMissingExports) {
    jnihost::Library kernel(vm, "kernel32.dll");
    kernel.call<void>("SetLastError");
    EXPECT_EQ(GetLastError(), reinterpret_cast<uintptr_t>(env));
    EXPECT_TRUE(taken().empty());
    kernel.call<uint32_t>("GetTickCount");
    EXPECT_TRUE(reported("GetTickCount: stack imbalance of -4 bytes"));
    kernel.call<void>("_Java_nothing@8");
    EXPECT_TRUE(reported("_Java_nothing@8: no such export"));
    jnihost::Library missing(vm, "no-such-library.dll");
    EXPECT_TRUE(reported("LoadLibraryA(\"no-such-library.dll\") failed"));
}

TEST_F(Host, UnexpectedFunctionEndsTheProcessNamingIt) {
    EXPECT_EXIT(env->MonitorEnter(vm.newPlainObject()), ::testing::ExitedWithCode(3),
                "JNI host: unexpected call to MonitorEnter");
}

}  // namespace
