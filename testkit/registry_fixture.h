// Support for the WinRegistry tests, which run against the real (Wine) registry: the JNI
// host fixture with the six WinRegistry exports bound to the test's own key (a
// regkit::ScopedTestKey, see registry_kit.h), and the pending CoreUtilException's message as
// a plain string.
#pragma once

#include <algorithm>
#include <string>
#include <utility>
#include <vector>

#include "host_fixture.h"
#include "registry_kit.h"

// Each test works in its own ScopedTestKey (path, jpath) through the WinRegistry exports.
class RegistryTest : public HostTest {
protected:
    static constexpr const char* kGetValue = regkit::kGetValue;
    static constexpr const char* kGetValues = regkit::kGetValues;
    static constexpr const char* kSetValue = regkit::kSetValue;
    static constexpr const char* kSetValues = regkit::kSetValues;
    static constexpr const char* kDeleteValue = regkit::kDeleteValue;
    static constexpr const char* kDeleteKey = regkit::kDeleteKey;

    jstring str(const std::string& utf8) { return vm.newStringUtf8(utf8); }
    // A Java path to a key below the test's own key.
    jstring sub(const std::string& relative) { return str(path + "\\" + relative); }

    // The exports with every argument given (root, key path, ...).
    jobject getValue(jint root, jstring keyPath, jstring name) {
        return lib.call<jobject>(kGetValue, jclass{}, root, keyPath, name);
    }
    jobject getValues(jint root, jstring keyPath) {
        return lib.call<jobject>(kGetValues, jclass{}, root, keyPath);
    }
    void setValue(jint root, jstring keyPath, jstring name, jobject value) {
        lib.call<void>(kSetValue, jclass{}, root, keyPath, name, value);
    }
    void setValues(jint root, jstring keyPath, jobject table) {
        lib.call<void>(kSetValues, jclass{}, root, keyPath, table);
    }
    void deleteValue(jstring keyPath, jstring name) {
        lib.call<void>(kDeleteValue, jclass{}, regkit::kCurrentUser, keyPath, name);
    }
    void deleteKey(jstring keyPath, bool recursive) {
        lib.call<void>(kDeleteKey, jclass{}, regkit::kCurrentUser, keyPath, static_cast<jboolean>(recursive));
    }

    // The same on the test's own key.
    jobject get(jstring name) { return getValue(regkit::kCurrentUser, jpath, name); }
    jobject getAll() { return getValues(regkit::kCurrentUser, jpath); }
    void set(jstring name, jobject value) { setValue(regkit::kCurrentUser, jpath, name, value); }
    void setAll(jobject table) { setValues(regkit::kCurrentUser, jpath, table); }

    // A java/util/Hashtable of the given entries, put in this order.
    jobject table(const std::vector<std::pair<jobject, jobject>>& entries) {
        jobject t = vm.newHashtable();
        for (const auto& [k, v] : entries) {
            vm.hashtablePut(t, k, v);
        }
        return t;
    }

    // The message of the pending exception, which must be a CoreUtilException, cleared;
    // empty when none is pending.
    std::string raised() {
        if (!vm.exceptionPending()) {
            return {};
        }
        const jnihost::PendingException e = vm.pendingException();
        vm.clearException();
        EXPECT_EQ(e.className, jnihost::kCoreUtilException) << e.message;
        return e.message;
    }

    // A value as one comparable string: "s:text", "i:number", "b:hex bytes" (or "?class").
    std::string describe(jobject value) {
        const std::string cls = value == nullptr ? "null" : vm.classNameOf(value);
        if (cls == "java/lang/String") {
            return "s:" + vm.stringUtf8(value);
        }
        if (cls == "java/lang/Integer") {
            return "i:" + std::to_string(vm.integerValue(value));
        }
        if (cls != "[B") {
            return "?" + cls;
        }
        std::string out = "b:";
        for (const uint8_t b : vm.byteArrayValue(value)) {
            out += "0123456789abcdef"[b >> 4];
            out += "0123456789abcdef"[b & 15];
        }
        return out;
    }

    // A table's entries sorted by name, values described as above, so that whole tables
    // compare in one assertion.
    using Entries = std::vector<std::pair<std::string, std::string>>;
    Entries contents(jobject table) {
        Entries out;
        for (const auto& [k, v] : vm.hashtableEntries(table)) {
            out.emplace_back(vm.stringUtf8(k), describe(v));
        }
        std::sort(out.begin(), out.end());
        return out;
    }

    regkit::ScopedTestKey key{::testing::UnitTest::GetInstance()->current_test_info()->name()};
    std::string path = key.path();
    jstring jpath = vm.newStringUtf8(path);
};
