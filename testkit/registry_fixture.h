// Support for the WinRegistry tests, which run against the real (Wine) registry.
//
// - ScopedTestKey: a key of one test's own below HKEY_CURRENT_USER\Software, removed with its
//   whole tree when the test ends (HKCU persists in the Wine prefix, so a leftover would leak
//   into the next run).
// - Readers and writers that go straight to ADVAPI32, past the library: to check what the
//   library really stored (type, exact bytes) and to plant data it could never write itself.
// - RegistryTest: the JNI host fixture with the six WinRegistry exports bound to the test's
//   key, and the pending CoreUtilException's message as a plain string. Every export call
//   runs under the heap and registry spies, and must leave no key open and no heap block
//   taken, whatever path it went.
#pragma once

#include <windows.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "heap_spy.h"
#include "host_fixture.h"
#include "registry_spy.h"

namespace regkit {

using Bytes = std::vector<uint8_t>;

inline const jint kCurrentUser = static_cast<jint>(0x80000001);
// A root handle value that is no predefined key: every open or create under it fails.
inline const jint kNoSuchRoot = static_cast<jint>(0x12345678);

// A value as Windows holds it. result is ERROR_FILE_NOT_FOUND when the key is missing.
struct RawValue {
    LONG result = ERROR_FILE_NOT_FOUND;
    DWORD type = REG_NONE;
    Bytes data;
};

inline RawValue rawValue(const std::string& path, const char* name) {
    RawValue raw;
    HKEY key;
    if (RegOpenKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return raw;
    }
    DWORD size = 0;
    raw.result = RegQueryValueExA(key, name, nullptr, &raw.type, nullptr, &size);
    if (raw.result == ERROR_SUCCESS) {
        raw.data.resize(size);
        raw.result = RegQueryValueExA(key, name, nullptr, &raw.type, raw.data.data(), &size);
        raw.data.resize(raw.result == ERROR_SUCCESS ? size : 0);
    }
    RegCloseKey(key);
    return raw;
}

// Creates the key with any missing keys above it and, given a name, sets that value to
// exactly `size` bytes of `data` (which need not fit the type). False on any failure.
inline bool setRawValue(const std::string& path, const char* name = nullptr, DWORD type = REG_NONE,
                        const void* data = nullptr, DWORD size = 0) {
    HKEY key;
    if (RegCreateKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key,
                        nullptr) != ERROR_SUCCESS) {
        return false;
    }
    const bool ok = name == nullptr ||
                    RegSetValueExA(key, name, 0, type, static_cast<const BYTE*>(data), size) == ERROR_SUCCESS;
    RegCloseKey(key);
    return ok;
}

// The number of sub-keys of a key; -1 when the key does not exist.
inline int subKeys(const std::string& path) {
    HKEY key;
    DWORD count = 0;
    if (RegOpenKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return -1;
    }
    RegQueryInfoKeyA(key, nullptr, nullptr, nullptr, &count, nullptr, nullptr, nullptr, nullptr, nullptr,
                     nullptr, nullptr);
    RegCloseKey(key);
    return static_cast<int>(count);
}

inline bool keyExists(const std::string& path) {
    return subKeys(path) >= 0;
}

// The value names of a key in the order RegEnumValueA lists them (Wine: alphabetical).
inline std::vector<std::string> valueNames(const std::string& path) {
    std::vector<std::string> names;
    HKEY key;
    if (RegOpenKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return names;
    }
    char name[16384];
    for (DWORD i = 0;; ++i) {
        DWORD capacity = sizeof name;
        if (RegEnumValueA(key, i, name, &capacity, nullptr, nullptr, nullptr, nullptr) != ERROR_SUCCESS) {
            break;
        }
        names.emplace_back(name, capacity);
    }
    RegCloseKey(key);
    return names;
}

// A tree below `root`: `depth` levels of `width` keys each, named k0, k1, ...; with
// `values`, every key above the leaves also holds a DWORD value "v". Returns the leaves.
inline std::vector<std::string> makeTree(const std::string& root, int depth, int width, bool values) {
    std::vector<std::string> level{root};
    for (int d = 0; d < depth; ++d) {
        std::vector<std::string> next;
        for (const std::string& parent : level) {
            if (values) {
                setRawValue(parent, "v", REG_DWORD, "\1\0\0\0", 4);
            }
            for (int k = 0; k < width; ++k) {
                next.push_back(parent + "\\k" + std::to_string(k));
            }
        }
        level = std::move(next);
    }
    for (const std::string& leaf : level) {
        setRawValue(leaf);
    }
    return level;
}

// HKCU\Software\TesselRegistryTests\<name>-<process id>, absent when made and removed with
// its tree when destroyed; the common parent goes too once no other run's key is left. The
// process id keeps apart the test programs that ctest runs side by side.
class ScopedTestKey {
public:
    explicit ScopedTestKey(const std::string& name)
        : path_(std::string(kRoot) + "\\" + name + "-" + std::to_string(GetCurrentProcessId())) {
        RegDeleteTreeA(HKEY_CURRENT_USER, path_.c_str());  // left by a run that crashed
    }
    ~ScopedTestKey() {
        RegDeleteTreeA(HKEY_CURRENT_USER, path_.c_str());
        RegDeleteKeyA(HKEY_CURRENT_USER, kRoot);  // fails while another run's key is there
    }
    ScopedTestKey(const ScopedTestKey&) = delete;
    ScopedTestKey& operator=(const ScopedTestKey&) = delete;

    const std::string& path() const { return path_; }

private:
    static constexpr const char* kRoot = "Software\\TesselRegistryTests";
    std::string path_;
};

}  // namespace regkit

// Each test works in its own ScopedTestKey (path, jpath) through the WinRegistry exports.
class RegistryTest : public HostTest {
protected:
    static constexpr const char* kGetValue =
        "_Java_com_velmor_coreutil_io_WinRegistry_nativeGetRegistryValue@20";
    static constexpr const char* kGetValues =
        "_Java_com_velmor_coreutil_io_WinRegistry_nativeGetRegistryValues@16";
    static constexpr const char* kSetValue =
        "_Java_com_velmor_coreutil_io_WinRegistry_nativeSetRegistryValue@24";
    static constexpr const char* kSetValues =
        "_Java_com_velmor_coreutil_io_WinRegistry_nativeSetRegistryValues@20";
    static constexpr const char* kDeleteValue =
        "_Java_com_velmor_coreutil_io_WinRegistry_nativeDeleteRegistryValue@20";
    static constexpr const char* kDeleteKey =
        "_Java_com_velmor_coreutil_io_WinRegistry_nativeDeleteRegistryKey@20";

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
