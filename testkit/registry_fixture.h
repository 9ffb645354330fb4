// Support for the WinRegistry tests, which run against the real (Wine) registry: the JNI
// host fixture with the six WinRegistry exports bound to the test's own key (a
// regkit::ScopedTestKey; the direct ADVAPI32 readers and writers are in registry_kit.h), and
// the pending CoreUtilException's message as a plain string. Every export call runs under
// the heap and registry spies, and must leave no key open and no heap block taken, whatever
// path it went.
#pragma once

#include <windows.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "heap_spy.h"
#include "host_fixture.h"
#include "registry_kit.h"
#include "registry_spy.h"

// Each test works in its own ScopedTestKey (path, jpath) through the WinRegistry exports.
class RegistryTest : public HostTest {
protected:
    static constexpr const char* kGetValue = regkit::kGetValue;
    static constexpr const char* kGetValues = regkit::kGetValues;
    static constexpr const char* kSetValue = regkit::kSetValue;
    static constexpr const char* kSetValues = regkit::kSetValues;
    static constexpr const char* kDeleteValue = regkit::kDeleteValue;
    static constexpr const char* kDeleteKey = regkit::kDeleteKey;

    void SetUp() override {
        const auto library = static_cast<HMODULE>(lib.handle());
        ASSERT_TRUE(testkit::heap_spy::install(library));
        ASSERT_TRUE(testkit::registry_spy::install(library));
    }

    // Checked when the export call it guards has returned.
    struct BalanceCheck {
        const char* exportName;
        ~BalanceCheck() {
            EXPECT_EQ(testkit::registry_spy::openKeys(), 0u) << exportName << " left a key open";
            EXPECT_EQ(testkit::registry_spy::strayCloses(), 0)
                << exportName << " closed a key it did not open";
            EXPECT_EQ(testkit::heap_spy::liveBlocks(), 0u) << exportName << " left heap blocks allocated";
        }
    };
    // Calls the export with the spies' records fresh, failing its n-th heap allocation when
    // failAllocationAt was set, on a heap rounding blocks up by blockSlack (for this call only).
    template <class R, class... A>
    R callExport(const char* exportName, A... args) {
        testkit::registry_spy::clear();
        testkit::heap_spy::reset();
        testkit::heap_spy::failAllocation(std::exchange(failAllocationAt, 0));
        testkit::heap_spy::roundUpBlocks(std::exchange(blockSlack, 0));
        BalanceCheck check{exportName};
        return lib.call<R>(exportName, jclass{}, args...);
    }

    jstring str(const std::string& utf8) { return vm.newStringUtf8(utf8); }
    // A Java path to a key below the test's own key.
    jstring sub(const std::string& relative) { return str(path + "\\" + relative); }

    // The exports with every argument given (root, key path, ...).
    jobject getValue(jint root, jstring keyPath, jstring name) {
        return callExport<jobject>(kGetValue, root, keyPath, name);
    }
    jobject getValues(jint root, jstring keyPath) { return callExport<jobject>(kGetValues, root, keyPath); }
    void setValue(jint root, jstring keyPath, jstring name, jobject value) {
        callExport<void>(kSetValue, root, keyPath, name, value);
    }
    void setValues(jint root, jstring keyPath, jobject table) {
        callExport<void>(kSetValues, root, keyPath, table);
    }
    void deleteValue(jstring keyPath, jstring name) {
        callExport<void>(kDeleteValue, regkit::kCurrentUser, keyPath, name);
    }
    void deleteKey(jstring keyPath, bool recursive) {
        callExport<void>(kDeleteKey, regkit::kCurrentUser, keyPath, static_cast<jboolean>(recursive));
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

    int failAllocationAt = 0;  // for the next export call; 0: none fails
    size_t blockSlack = 0;     // for the next export call: heap blocks that much larger
    regkit::ScopedTestKey key{::testing::UnitTest::GetInstance()->current_test_info()->name()};
    std::string path = key.path();
    jstring jpath = vm.newStringUtf8(path);
};
