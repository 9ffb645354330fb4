// WinRegistry against Wine's real registry: each test works below a fresh key of its own
// under HKEY_CURRENT_USER\Software and removes it afterwards.
#include <windows.h>

#include <algorithm>
#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "host_fixture.h"

namespace {

const jint kCurrentUser = static_cast<jint>(0x80000001);
const char kTestRoot[] = "Software\\TesselRegistryTests";

const char kGetValue[] = "_Java_com_velmor_coreutil_io_WinRegistry_nativeGetRegistryValue@20";
const char kGetValues[] = "_Java_com_velmor_coreutil_io_WinRegistry_nativeGetRegistryValues@16";
const char kSetValue[] = "_Java_com_velmor_coreutil_io_WinRegistry_nativeSetRegistryValue@24";
const char kSetValues[] = "_Java_com_velmor_coreutil_io_WinRegistry_nativeSetRegistryValues@20";
const char kDeleteValue[] = "_Java_com_velmor_coreutil_io_WinRegistry_nativeDeleteRegistryValue@20";
const char kDeleteKey[] = "_Java_com_velmor_coreutil_io_WinRegistry_nativeDeleteRegistryKey@20";

using Bytes = std::vector<uint8_t>;

// A value as Windows holds it, read past the library.
struct RawValue {
    LONG result = ERROR_FILE_NOT_FOUND;
    DWORD type = REG_NONE;
    Bytes data;
};

RawValue rawValue(const std::string& path, const char* name) {
    RawValue raw;
    HKEY key;
    if (RegOpenKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return raw;
    }
    raw.data.resize(70000);
    DWORD size = static_cast<DWORD>(raw.data.size());
    raw.result = RegQueryValueExA(key, name, nullptr, &raw.type, raw.data.data(), &size);
    raw.data.resize(raw.result == ERROR_SUCCESS ? size : 0);
    RegCloseKey(key);
    return raw;
}

// Creates the key (with the missing keys above it) and, given a name, sets that value.
void setRawValue(const std::string& path, const char* name = nullptr, DWORD type = REG_NONE,
                 const void* data = nullptr, DWORD size = 0) {
    HKEY key;
    ASSERT_EQ(RegCreateKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key,
                              nullptr),
              ERROR_SUCCESS);
    if (name != nullptr) {
        EXPECT_EQ(RegSetValueExA(key, name, 0, type, static_cast<const BYTE*>(data), size), ERROR_SUCCESS);
    }
    RegCloseKey(key);
}

// The number of sub-keys of an existing key, -1 when the key does not exist.
int subKeys(const std::string& path) {
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
bool keyExists(const std::string& path) {
    return subKeys(path) >= 0;
}

class Registry : public HostTest {
protected:
    void SetUp() override {
        // The process id keeps apart the runs that ctest starts side by side.
        path = std::string(kTestRoot) + "\\" +
               ::testing::UnitTest::GetInstance()->current_test_info()->name() + "-" +
               std::to_string(GetCurrentProcessId());
        RegDeleteTreeA(HKEY_CURRENT_USER, path.c_str());
        jpath = vm.newStringUtf8(path);
    }
    void TearDown() override {
        RegDeleteTreeA(HKEY_CURRENT_USER, path.c_str());
        RegDeleteKeyA(HKEY_CURRENT_USER, kTestRoot);  // only when no other test's key is left
    }

    jstring str(const std::string& utf8) { return vm.newStringUtf8(utf8); }
    jstring sub(const std::string& relative) { return str(path + "\\" + relative); }

    // The message of the pending CoreUtilException, cleared; empty when none is pending.
    std::string raised() {
        if (!vm.exceptionPending()) {
            return {};
        }
        const jnihost::PendingException e = vm.pendingException();
        vm.clearException();
        EXPECT_EQ(e.className, jnihost::kCoreUtilException) << e.message;
        return e.message;
    }

    void set(jstring name, jobject value) {
        lib.call<void>(kSetValue, jclass{}, kCurrentUser, jpath, name, value);
    }
    jobject get(jstring name) { return lib.call<jobject>(kGetValue, jclass{}, kCurrentUser, jpath, name); }
    jobject getAll() { return lib.call<jobject>(kGetValues, jclass{}, kCurrentUser, jpath); }
    void setAll(jobject table) { lib.call<void>(kSetValues, jclass{}, kCurrentUser, jpath, table); }
    void deleteKey(jstring keyPath, bool recursive) {
        lib.call<void>(kDeleteKey, jclass{}, kCurrentUser, keyPath, static_cast<jboolean>(recursive));
    }

    // The table's entries by name, values described as "s:text", "i:number" or "b:size".
    std::vector<std::pair<std::string, std::string>> describe(jobject table) {
        std::vector<std::pair<std::string, std::string>> out;
        for (auto [k, v] : vm.hashtableEntries(table)) {
            const std::string cls = vm.classNameOf(v);
            std::string text = cls == "java/lang/String"    ? "s:" + vm.stringUtf8(v)
                               : cls == "java/lang/Integer" ? "i:" + std::to_string(vm.integerValue(v))
                               : cls == "[B" ? "b:" + std::to_string(vm.byteArrayValue(v).size())
                                             : "?" + cls;
            out.emplace_back(vm.stringUtf8(k), text);
        }
        std::sort(out.begin(), out.end());
        return out;
    }

    std::string path;
    jstring jpath = nullptr;
};

using Entries = std::vector<std::pair<std::string, std::string>>;

TEST_F(Registry, EachKindRoundTripsWithItsRegistryType) {
    set(str("text"), str("hello"));
    set(str("empty"), str(""));
    set(str("negative"), vm.newInteger(-2));
    set(str("allOnes"), vm.newInteger(-1));
    set(str("bytes"), vm.newByteArray({0, 1, 0xfe, 0xff}));
    set(str("noBytes"), vm.newByteArray({}));
    ASSERT_EQ(raised(), "");

    EXPECT_EQ(rawValue(path, "text").type, static_cast<DWORD>(REG_SZ));
    EXPECT_EQ(rawValue(path, "text").data, (Bytes{'h', 'e', 'l', 'l', 'o', 0}));
    EXPECT_EQ(rawValue(path, "empty").data, Bytes{0}) << "the NUL alone";
    EXPECT_EQ(rawValue(path, "negative").type, static_cast<DWORD>(REG_DWORD));
    EXPECT_EQ(rawValue(path, "negative").data, (Bytes{0xfe, 0xff, 0xff, 0xff}));
    EXPECT_EQ(rawValue(path, "bytes").type, static_cast<DWORD>(REG_BINARY));
    EXPECT_EQ(rawValue(path, "noBytes").type, static_cast<DWORD>(REG_BINARY));
    EXPECT_TRUE(rawValue(path, "noBytes").data.empty());

    EXPECT_EQ(vm.stringUtf8(get(str("text"))), "hello");
    EXPECT_EQ(vm.stringUtf8(get(str("empty"))), "");
    EXPECT_EQ(vm.integerValue(get(str("negative"))), -2);
    EXPECT_EQ(vm.integerValue(get(str("allOnes"))), -1);
    EXPECT_EQ(vm.byteArrayValue(get(str("bytes"))), (Bytes{0, 1, 0xfe, 0xff}));
    jobject none = get(str("noBytes"));
    ASSERT_NE(none, nullptr);
    EXPECT_EQ(vm.classNameOf(none), "[B");
    EXPECT_TRUE(vm.byteArrayValue(none).empty());

    // A null name is the unnamed default value, as is an empty one.
    set(nullptr, str("default text"));
    EXPECT_EQ(rawValue(path, "").data.size(), 13u);
    EXPECT_EQ(vm.stringUtf8(get(nullptr)), "default text");
    EXPECT_EQ(vm.stringUtf8(get(str(""))), "default text");
    lib.call<void>(kDeleteValue, jclass{}, kCurrentUser, jpath, jstring{});
    EXPECT_EQ(rawValue(path, "").result, ERROR_FILE_NOT_FOUND);
    EXPECT_EQ(raised(), "");
}

TEST_F(Registry, TextIsSizedByItsConvertedBytes) {
    // A surrogate pair is two Java units; whatever the code page makes of it, exactly the
    // converted bytes and one NUL are stored. (Code page 932 below is where sizes differ.)
    set(str("emoji"), vm.newString(u"a\U0001F600b"));
    const std::string converted = [] {
        char out[16] = {};
        WideCharToMultiByte(CP_ACP, 0, L"a\U0001F600b", 4, out, sizeof out - 1, nullptr, nullptr);
        return std::string(out);
    }();
    Bytes expected(converted.begin(), converted.end());
    expected.push_back(0);
    EXPECT_EQ(rawValue(path, "emoji").data, expected) << "exactly the text and one NUL";

    // A NUL inside the Java string is stored with what follows it, and ends the text read.
    set(str("nul"), vm.newString(std::u16string(u"ab\0cd", 5)));
    EXPECT_EQ(rawValue(path, "nul").data, (Bytes{'a', 'b', 0, 'c', 'd', 0}));
    EXPECT_EQ(vm.stringUtf8(get(str("nul"))), "ab");
    EXPECT_EQ(raised(), "");
}

TEST_F(Registry, StoredDataIsReadWithinItsBytesAndOnlyInTheThreeKinds) {
    setRawValue(path, "unterminated", REG_SZ, "xyz", 3);
    setRawValue(path, "emptySz", REG_SZ, "", 0);
    const uint8_t eight[8] = {7, 0, 0, 0, 9, 9, 9, 9};
    setRawValue(path, "longDword", REG_DWORD, eight, 8);
    setRawValue(path, "shortDword", REG_DWORD, eight, 2);

    EXPECT_EQ(vm.stringUtf8(get(str("unterminated"))), "xyz");
    EXPECT_EQ(vm.stringUtf8(get(str("emptySz"))), "");
    EXPECT_EQ(vm.integerValue(get(str("longDword"))), 7);
    EXPECT_EQ(raised(), "");
    EXPECT_EQ(get(str("shortDword")), nullptr);
    EXPECT_EQ(raised(), "Unable to convert MS registry value to java");

    const char data[] = "%PATH%\0second\0";
    const std::pair<const char*, DWORD> kinds[] = {
        {"expand", REG_EXPAND_SZ}, {"multi", REG_MULTI_SZ}, {"qword", REG_QWORD}, {"none", REG_NONE}};
    for (auto [name, type] : kinds) {
        setRawValue(path, name, type, data, 8);
        EXPECT_EQ(get(str(name)), nullptr) << name;
        EXPECT_EQ(raised(), "Unable to convert MS registry value to java") << name;
    }
    // One such value fails the whole bulk read, however many were read before it.
    EXPECT_EQ(getAll(), nullptr);
    EXPECT_EQ(raised(), "Unable to convert MS registry value to java");
}

TEST_F(Registry, ReadFailuresRaiseTheirMessages) {
    setRawValue(path);
    EXPECT_EQ(get(str("missing")), nullptr);
    EXPECT_EQ(raised(), "RegQueryValueEx() call failed");

    jstring missingKey = sub("missing");
    EXPECT_EQ(lib.call<jobject>(kGetValue, jclass{}, kCurrentUser, missingKey, str("x")), nullptr);
    EXPECT_EQ(raised(), "Unable to open registry key");
    EXPECT_EQ(lib.call<jobject>(kGetValues, jclass{}, kCurrentUser, missingKey), nullptr);
    EXPECT_EQ(raised(), "Unable to open registry key");
    EXPECT_EQ(lib.call<jobject>(kGetValues, jclass{}, static_cast<jint>(0x12345678), jpath), nullptr);
    EXPECT_EQ(raised(), "Unable to open registry key") << "a root that is no key";

    EXPECT_EQ(lib.call<jobject>(kGetValue, jclass{}, kCurrentUser, jstring{}, str("x")), nullptr);
    EXPECT_EQ(raised(), "Cannot work with null registry key");
    EXPECT_EQ(lib.call<jobject>(kGetValues, jclass{}, kCurrentUser, jstring{}), nullptr);
    EXPECT_EQ(raised(), "Cannot work with null registry key");
}

TEST_F(Registry, BulkReadGivesEveryValueByName) {
    setRawValue(path);
    jobject empty = getAll();
    ASSERT_NE(empty, nullptr);
    EXPECT_EQ(vm.classNameOf(empty), "java/util/Hashtable");
    EXPECT_TRUE(vm.hashtableEntries(empty).empty());

    set(nullptr, str("d"));
    set(str("s"), str("text"));
    set(str("i"), vm.newInteger(42));
    set(str("b"), vm.newByteArray({1, 2, 3}));
    setRawValue(path + "\\child");  // sub-keys are no values
    EXPECT_EQ(describe(getAll()), (Entries{{"", "s:d"}, {"b", "b:3"}, {"i", "i:42"}, {"s", "s:text"}}));
    EXPECT_EQ(raised(), "");
}

TEST_F(Registry, NameTooLongForTheBufferEndsTheBulkRead) {
    const std::string longName = "m" + std::string(255, 'x');  // 256 characters
    for (const char* name : {"a", "b", "y", "z"}) {
        setRawValue(path, name, REG_SZ, name, 2);
    }
    setRawValue(path, longName.c_str(), REG_DWORD, "\1\0\0\0", 4);

    // Whatever order Windows lists values in, the table holds those listed before the long one.
    Entries expected;
    HKEY key;
    ASSERT_EQ(RegOpenKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, KEY_READ, &key), ERROR_SUCCESS);
    for (DWORD i = 0;; ++i) {
        char name[300];
        DWORD capacity = sizeof name;
        ASSERT_EQ(RegEnumValueA(key, i, name, &capacity, nullptr, nullptr, nullptr, nullptr), ERROR_SUCCESS);
        if (name == longName) {
            break;
        }
        expected.emplace_back(name, std::string("s:") + name);
    }
    RegCloseKey(key);
    std::sort(expected.begin(), expected.end());

    jobject table = getAll();
    EXPECT_EQ(raised(), "");
    ASSERT_NE(table, nullptr);
    EXPECT_EQ(describe(table), expected);
}

TEST_F(Registry, FailedHashtableLookupsRaiseTheirFixedMessages) {
    setRawValue(path);
    const std::pair<std::string, const char*> member[] = {
        {"<init>", "Unable to get function IDs for Hashtable."},
        {"put", "Unable to get function IDs for Hashtable."}};
    vm.failFindClass("java/util/Hashtable");
    EXPECT_EQ(getAll(), nullptr);
    EXPECT_EQ(raised(), "Unable to find Hashtable class.");
    vm.clearFailures();
    for (const auto& [name, message] : member) {
        vm.failMemberLookup("java/util/Hashtable", name);
        EXPECT_EQ(getAll(), nullptr);
        EXPECT_EQ(raised(), message) << name;
        vm.clearFailures();
    }
    vm.failNewObject("java/util/Hashtable");
    EXPECT_EQ(getAll(), nullptr);
    EXPECT_EQ(raised(), "Unable to create new Hashtable object.");
}

TEST_F(Registry, FailedConversionLeavesTheVirtualMachineErrorPending) {
    set(str("i"), vm.newInteger(5));
    set(str("b"), vm.newByteArray({1}));
    vm.failMemberLookup("java/lang/Integer", "<init>");
    EXPECT_EQ(get(str("i")), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoSuchMethodError");
    vm.clearFailures();
    vm.failNewObject("[B");
    EXPECT_EQ(getAll(), nullptr);
    EXPECT_NE(takeException(), "");
    vm.clearFailures();

    vm.failMemberLookup("java/lang/Integer", "intValue");
    set(str("i"), vm.newInteger(6));
    EXPECT_EQ(takeException(), "java/lang/NoSuchMethodError");
    vm.failFindClass("java/lang/String");
    set(str("s"), str("never"));
    EXPECT_EQ(takeException(), "java/lang/NoClassDefFoundError");
    vm.clearFailures();
    EXPECT_EQ(vm.integerValue(get(str("i"))), 5) << "nothing was written";
    EXPECT_EQ(rawValue(path, "s").result, ERROR_FILE_NOT_FOUND);

    // Without the exception class, the virtual machine's own error reaches Java.
    vm.failFindClass(jnihost::kCoreUtilException);
    EXPECT_EQ(get(str("missing")), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoClassDefFoundError");
}

TEST_F(Registry, WritesCreateEveryMissingLevelAndReadBackEqual) {
    lib.call<void>(kSetValue, jclass{}, kCurrentUser, sub("a\\b\\c"), str("v"), vm.newInteger(3));
    EXPECT_EQ(raised(), "");
    EXPECT_EQ(rawValue(path + "\\a\\b\\c", "v").data, (Bytes{3, 0, 0, 0}));

    lib.call<void>(kSetValues, jclass{}, kCurrentUser, sub("x\\y"), vm.newHashtable());
    EXPECT_EQ(raised(), "");
    EXPECT_TRUE(keyExists(path + "\\x\\y")) << "an empty table still creates the key";

    jobject table = vm.newHashtable();
    vm.hashtablePut(table, str("s"), str("text"));
    vm.hashtablePut(table, str("i"), vm.newInteger(-7));
    vm.hashtablePut(table, str("b"), vm.newByteArray({9, 8}));
    vm.hashtablePut(table, str(""), str("default"));
    setAll(table);
    EXPECT_EQ(raised(), "");
    EXPECT_EQ(describe(getAll()), describe(table));
    EXPECT_EQ(vm.byteArrayValue(get(str("b"))), (Bytes{9, 8}));
}

TEST_F(Registry, WriteFailuresRaiseTheirMessages) {
    setRawValue(path);
    set(str("v"), jobject{});
    EXPECT_EQ(raised(), "Cannot set registry value to null object");
    lib.call<void>(kSetValue, jclass{}, kCurrentUser, jstring{}, str("v"), jobject{});
    EXPECT_EQ(raised(), "Cannot set registry value to null object") << "the value is tested first";
    lib.call<void>(kSetValue, jclass{}, kCurrentUser, jstring{}, str("v"), vm.newInteger(1));
    EXPECT_EQ(raised(), "Cannot work with null key");
    lib.call<void>(kSetValues, jclass{}, kCurrentUser, jpath, jobject{});
    EXPECT_EQ(raised(), "Cannot set registry value to null object");
    lib.call<void>(kSetValues, jclass{}, kCurrentUser, jstring{}, vm.newHashtable());
    EXPECT_EQ(raised(), "Cannot work with null key");

    for (jobject unstorable : {vm.newPlainObject(), static_cast<jobject>(vm.newStringArray({}))}) {
        lib.call<void>(kSetValue, jclass{}, kCurrentUser, sub("new"), str("v"), unstorable);
        EXPECT_EQ(raised(), "Unable to determine type for registry value");
    }
    EXPECT_TRUE(keyExists(path + "\\new"));
    EXPECT_EQ(rawValue(path + "\\new", "v").result, ERROR_FILE_NOT_FOUND);

    const jint noKey = static_cast<jint>(0x12345678);
    lib.call<void>(kSetValue, jclass{}, noKey, jpath, str("v"), vm.newInteger(1));
    EXPECT_EQ(raised(), "Unable to create/open registry key");
    lib.call<void>(kSetValues, jclass{}, noKey, jpath, vm.newHashtable());
    EXPECT_EQ(raised(), "Unable to create/open registry key");

    // Windows refuses a value name beyond 16383 characters.
    set(str(std::string(20000, 'n')), vm.newInteger(1));
    EXPECT_EQ(raised(), "Unable to set registry value.  Error in RegSetValueEx() call.");
    EXPECT_EQ(subKeys(path), 1) << "no key was created for the null arguments";
}

TEST_F(Registry, BulkWriteStopsAtTheFirstBadEntryKeepingEarlierOnes) {
    jobject nonStringKey = vm.newHashtable();
    vm.hashtablePut(nonStringKey, str("first"), vm.newInteger(1));
    vm.hashtablePut(nonStringKey, vm.newInteger(2), vm.newInteger(2));
    vm.hashtablePut(nonStringKey, str("after"), vm.newInteger(3));
    setAll(nonStringKey);
    EXPECT_EQ(raised(), "Non-String key in hashtable.");
    EXPECT_EQ(describe(getAll()), (Entries{{"first", "i:1"}}));

    jobject unstorable = vm.newHashtable();
    vm.hashtablePut(unstorable, str("second"), str("two"));
    vm.hashtablePut(unstorable, str("plain"), vm.newPlainObject());
    vm.hashtablePut(unstorable, str("later"), str("never"));
    setAll(unstorable);
    EXPECT_EQ(raised(), "Unable to determine type for registry value");
    EXPECT_EQ(describe(getAll()), (Entries{{"first", "i:1"}, {"second", "s:two"}}));
}

TEST_F(Registry, FailedTableLookupsRaiseTheirFixedMessagesAfterCreatingTheKey) {
    struct Case {
        const char* cls;
        const char* member;  // null: the class lookup fails
        const char* message;
    };
    const Case cases[] = {
        {"java/util/Hashtable", nullptr, "Unable to find Hashtable class."},
        {"java/util/Enumeration", nullptr, "Unable to find Enumeration class."},
        {"java/util/Hashtable", "keys", "Unable to get Hashtable.keys() function."},
        {"java/util/Enumeration", "hasMoreElements", "Unable to get Enumeration.hasMoreElements() function"},
        {"java/util/Enumeration", "nextElement", "Unable to get Enumeration.nextElement() function."},
        {"java/util/Hashtable", "get", "Unable to get Hashtable.get() function"},
    };
    jobject table = vm.newHashtable();
    vm.hashtablePut(table, str("v"), vm.newInteger(1));
    for (const Case& c : cases) {
        if (c.member == nullptr) {
            vm.failFindClass(c.cls);
        } else {
            vm.failMemberLookup(c.cls, c.member);
        }
        setAll(table);
        EXPECT_EQ(raised(), c.message);
        vm.clearFailures();
        EXPECT_TRUE(keyExists(path));
        EXPECT_EQ(rawValue(path, "v").result, ERROR_FILE_NOT_FOUND) << c.message;
    }
}

TEST_F(Registry, DeletesRemoveWhatTheyMayAndRefuseTheRest) {
    set(str("v"), str("x"));
    lib.call<void>(kDeleteValue, jclass{}, kCurrentUser, jpath, str("v"));
    EXPECT_EQ(raised(), "");
    EXPECT_EQ(rawValue(path, "v").result, ERROR_FILE_NOT_FOUND);

    lib.call<void>(kDeleteValue, jclass{}, kCurrentUser, jpath, str("v"));
    EXPECT_EQ(raised(), "Unable to delete registry value");
    lib.call<void>(kDeleteValue, jclass{}, kCurrentUser, sub("missing"), str("v"));
    EXPECT_EQ(raised(), "Unable to open registry key");
    lib.call<void>(kDeleteValue, jclass{}, kCurrentUser, jstring{}, str("v"));
    EXPECT_EQ(raised(), "Cannot work with null registry key");

    deleteKey(str(""), true);
    EXPECT_EQ(raised(), "Invalid registry key");
    deleteKey(jstring{}, true);
    EXPECT_EQ(raised(), "Cannot work with null registry key");

    deleteKey(sub("missing"), false);
    EXPECT_EQ(raised(), "Unable to remove non-empty key");
    deleteKey(sub("missing"), true);
    EXPECT_EQ(raised(), "Unable to delete one or more recursive keys");
    setRawValue(path + "\\empty");
    deleteKey(sub("empty"), false);
    EXPECT_EQ(raised(), "");
    EXPECT_FALSE(keyExists(path + "\\empty"));

    set(str("v"), vm.newInteger(1));
    deleteKey(jpath, false);
    EXPECT_EQ(raised(), "Unable to remove non-empty key");
    EXPECT_EQ(rawValue(path, "v").type, static_cast<DWORD>(REG_DWORD)) << "a refused key keeps its values";
    deleteKey(jpath, true);
    EXPECT_EQ(raised(), "");
    EXPECT_FALSE(keyExists(path)) << "a key with values but no sub-keys goes with them";
}

TEST_F(Registry, RecursiveDeleteRemovesTheLastLevelWithItsWholeTree) {
    // Four levels, three keys wide at each, values at every level.
    std::vector<std::string> level{path + "\\tree"};
    for (int depth = 0; depth < 4; ++depth) {
        std::vector<std::string> next;
        for (const std::string& parent : level) {
            setRawValue(parent, "v", REG_DWORD, "\1\0\0\0", 4);
            for (const char* child : {"k1", "k2", "k3"}) {
                next.push_back(parent + "\\" + child);
            }
        }
        level = std::move(next);
    }
    for (const std::string& leaf : level) {
        setRawValue(leaf);
    }
    deleteKey(sub("tree"), false);
    EXPECT_EQ(raised(), "Unable to remove non-empty key");
    EXPECT_TRUE(keyExists(level.front()));

    // Only the last level of the path goes, with all below it; the levels above stay.
    deleteKey(sub("tree\\k1\\k2"), true);
    EXPECT_EQ(raised(), "");
    EXPECT_EQ(subKeys(path + "\\tree\\k1"), 2);
    deleteKey(sub("tree"), true);
    EXPECT_EQ(raised(), "");
    EXPECT_EQ(subKeys(path), 0);
}

// Volume: many values in one call each way, and a large tree removed in one call.
TEST_F(Registry, LoadBulkWriteReadAndTreeDelete) {
    jobject table = vm.newHashtable();
    for (int i = 0; i < 2000; ++i) {
        jobject value = i % 3 == 0 ? static_cast<jobject>(str("value " + std::to_string(i)))
                        : i % 3 == 1
                            ? vm.newInteger(i * 7919)
                            : static_cast<jobject>(vm.newByteArray(Bytes(i % 50, static_cast<uint8_t>(i))));
        vm.hashtablePut(table, str("name" + std::to_string(i)), value);
    }
    setAll(table);
    ASSERT_EQ(raised(), "");
    jobject back = getAll();
    ASSERT_NE(back, nullptr);
    EXPECT_EQ(vm.hashtableEntries(back).size(), 2000u);
    EXPECT_EQ(describe(back), describe(table));
    EXPECT_EQ(vm.byteArrayValue(vm.hashtableGet(back, str("name1997"))),
              Bytes(47, static_cast<uint8_t>(1997)));

    // 10 x 10 x 10 keys below the tree's own key (1,000 keys, 1,110 with the inner ones).
    for (int a = 0; a < 10; ++a) {
        for (int b = 0; b < 10; ++b) {
            for (int c = 0; c < 10; ++c) {
                setRawValue(path + "\\tree\\" + std::to_string(a) + "\\" + std::to_string(b) + "\\" +
                            std::to_string(c));
            }
        }
    }
    deleteKey(jpath, true);
    EXPECT_EQ(raised(), "");
    EXPECT_FALSE(keyExists(path));
}

// Under a double-byte ANSI code page (started with a Japanese locale) one character can be
// two bytes; stored text and names must keep all of them.
using RegistryAcp932 = Registry;

TEST_F(RegistryAcp932, DoubleByteTextIsStoredWhole) {
    if (GetACP() != 932) {
        GTEST_SKIP() << "needs ANSI code page 932; ctest runs this under a Japanese locale";
    }
    const std::u16string kanji = u"\u65e5\u672c\u8a9e-x";  // three kanji of two bytes each
    set(vm.newString(u"\u540d\u524d"), vm.newString(kanji));
    EXPECT_EQ(raised(), "");

    char name[16] = {};
    ASSERT_EQ(WideCharToMultiByte(CP_ACP, 0, L"\u540d\u524d", -1, name, sizeof name, nullptr, nullptr), 5);
    EXPECT_EQ(rawValue(path, name).data.size(), 9u) << "eight bytes of text and the NUL";
    EXPECT_EQ(vm.stringValue(get(vm.newString(u"\u540d\u524d"))), kanji);
    EXPECT_EQ(raised(), "");

    jpath = vm.newString(jnihost::utf16(path) + u"\\\u30ad\u30fc");
    set(str("v"), vm.newInteger(1));
    jobject table = getAll();
    ASSERT_NE(table, nullptr);
    EXPECT_EQ(vm.integerValue(vm.hashtableGet(table, str("v"))), 1);
}

}  // namespace
