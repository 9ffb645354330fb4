// WinRegistry against Wine's real registry: each test works below a fresh key of its own
// under HKEY_CURRENT_USER\Software that is removed afterwards (testkit/registry_fixture.h).
#include <windows.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <functional>
#include <iterator>
#include <string>
#include <vector>

#include "registry_fixture.h"

namespace {

using regkit::Bytes;
using regkit::kCurrentUser;
using regkit::keyExists;
using regkit::rawValue;
using regkit::setRawValue;
using regkit::valueNames;
using Registry = RegistryTest;

const char kCannotConvert[] = "Unable to convert MS registry value to java";
const char kNoType[] = "Unable to determine type for registry value";

TEST_F(Registry, EachKindRoundTripsWithItsRegistryType) {
    struct Case {
        const char* name;
        jobject value;
        DWORD type;
        Bytes stored;
    };
    const Case cases[] = {
        {"text", str("hello"), REG_SZ, {'h', 'e', 'l', 'l', 'o', 0}},
        {"empty", str(""), REG_SZ, {0}},
        {"negative", vm.newInteger(-2), REG_DWORD, {0xfe, 0xff, 0xff, 0xff}},
        {"allOnes", vm.newInteger(-1), REG_DWORD, {0xff, 0xff, 0xff, 0xff}},
        {"bytes", vm.newByteArray({0, 1, 0xfe, 0xff}), REG_BINARY, {0, 1, 0xfe, 0xff}},
        {"noBytes", vm.newByteArray({}), REG_BINARY, {}},
    };
    for (const Case& c : cases) {
        set(str(c.name), c.value);
        EXPECT_EQ(raised(), "") << c.name;
        EXPECT_EQ(vm.copyBackCount(), 0) << c.name << ": an array only read is not copied back";
        const regkit::RawValue raw = rawValue(path, c.name);
        EXPECT_EQ(raw.type, c.type) << c.name;
        EXPECT_EQ(raw.data, c.stored) << c.name;
        EXPECT_EQ(describe(get(str(c.name))), describe(c.value)) << c.name;
    }

    // A NUL inside the Java string is stored with what follows it, and ends the text read.
    set(str("nul"), vm.newString(std::u16string(u"ab\0cd", 5)));
    EXPECT_EQ(rawValue(path, "nul").data, (Bytes{'a', 'b', 0, 'c', 'd', 0}));
    EXPECT_EQ(vm.stringUtf8(get(str("nul"))), "ab");

    // A null name is the unnamed default value, as is an empty one.
    set(nullptr, str("default text"));
    EXPECT_EQ(rawValue(path, "").data.size(), 13u);
    EXPECT_EQ(vm.stringUtf8(get(nullptr)), "default text");
    EXPECT_EQ(vm.stringUtf8(get(str(""))), "default text");
    deleteValue(jpath, nullptr);
    EXPECT_EQ(rawValue(path, "").result, ERROR_FILE_NOT_FOUND);
    EXPECT_EQ(raised(), "");
}

// A heap may hand out more than it was asked for; the stored text is the converted bytes
// and one terminator, never the block's size.
TEST_F(Registry, TextIsStoredAtItsConvertedSizeWhateverTheHeapRoundsTo) {
    for (const char* text : {"", "a", "seven b", "twelve bytes"}) {
        blockSlack = 13;
        set(str("t"), str(text));
        EXPECT_EQ(raised(), "");
        Bytes expected(text, text + std::strlen(text) + 1);
        EXPECT_EQ(rawValue(path, "t").data, expected) << text;
    }
}

TEST_F(Registry, StoredDataIsReadWithinItsBytesAndOnlyInTheThreeKinds) {
    const uint8_t eight[8] = {7, 0, 0, 0, 9, 9, 9, 9};
    setRawValue(path, "unterminated", REG_SZ, "xyz", 3);
    setRawValue(path, "emptySz", REG_SZ, "", 0);
    setRawValue(path, "longDword", REG_DWORD, eight, 8);
    EXPECT_EQ(vm.stringUtf8(get(str("unterminated"))), "xyz");
    EXPECT_EQ(vm.stringUtf8(get(str("emptySz"))), "");
    EXPECT_EQ(vm.integerValue(get(str("longDword"))), 7);
    EXPECT_EQ(raised(), "");

    const std::pair<const char*, DWORD> refused[] = {{"shortDword", REG_DWORD},
                                                     {"expand", REG_EXPAND_SZ},
                                                     {"multi", REG_MULTI_SZ},
                                                     {"qword", REG_QWORD},
                                                     {"none", REG_NONE}};
    for (auto [name, type] : refused) {
        setRawValue(path, name, type, "%PATH%\0second\0", type == REG_DWORD ? 2 : 8);
        EXPECT_EQ(get(str(name)), nullptr) << name;
        EXPECT_EQ(raised(), kCannotConvert) << name;
    }
    // One such value fails the whole bulk read, however many were read before it.
    EXPECT_EQ(getAll(), nullptr);
    EXPECT_EQ(raised(), kCannotConvert);
}

TEST_F(Registry, BulkReadGivesEveryValueByNameUntilANameTooLongForItsBuffer) {
    setRawValue(path);
    jobject empty = getAll();
    ASSERT_NE(empty, nullptr);
    EXPECT_TRUE(vm.hashtableEntries(empty).empty());

    setAll(table({{str(""), str("d")},
                  {str("s"), str("text")},
                  {str("i"), vm.newInteger(42)},
                  {str("b"), vm.newByteArray({1, 2, 3})}}));
    setRawValue(path + "\\child");  // sub-keys are no values
    const std::string fits = "l" + std::string(254, 'x'), tooLong = "m" + std::string(255, 'x');
    setRawValue(path, fits.c_str(), REG_SZ, "f", 2);
    const Entries all = contents(getAll());
    EXPECT_EQ(all, (Entries{{"", "s:d"}, {"b", "b:010203"}, {"i", "i:42"}, {fits, "s:f"}, {"s", "s:text"}}));

    // A name of 256 characters ends the enumeration without a raise: the table holds the
    // values Windows lists before it, whatever that order is.
    setRawValue(path, tooLong.c_str(), REG_DWORD, "\1\0\0\0", 4);
    const std::vector<std::string> order = valueNames(path);
    const auto cut = std::find(order.begin(), order.end(), tooLong);
    Entries expected;
    std::copy_if(all.begin(), all.end(), std::back_inserter(expected),
                 [&](const auto& entry) { return std::find(order.begin(), cut, entry.first) != cut; });
    EXPECT_EQ(contents(getAll()), expected);
    EXPECT_EQ(raised(), "");
}

TEST_F(Registry, WritesCreateMissingKeysAndABadEntryEndsTheBulkWriteKeepingEarlierOnes) {
    setValue(kCurrentUser, sub("a\\b\\c"), str("v"), vm.newInteger(3));
    EXPECT_EQ(rawValue(path + "\\a\\b\\c", "v").data, (Bytes{3, 0, 0, 0}));
    setValues(kCurrentUser, sub("x\\y"), vm.newHashtable());
    EXPECT_TRUE(keyExists(path + "\\x\\y")) << "an empty table still creates the key";
    jobject written = table({{str("s"), str("text")},
                             {str("i"), vm.newInteger(-7)},
                             {str("b"), vm.newByteArray({9, 8})},
                             {str(""), str("default")}});
    setValues(kCurrentUser, sub("bulk"), written);
    EXPECT_EQ(raised(), "");
    EXPECT_EQ(contents(getValues(kCurrentUser, sub("bulk"))), contents(written));

    // No transaction: the entries handed out before the bad one stay written, later ones are not.
    setAll(table({{str("first"), vm.newInteger(1)},
                  {vm.newInteger(2), vm.newInteger(2)},
                  {str("after"), vm.newInteger(3)}}));
    EXPECT_EQ(raised(), "Non-String key in hashtable.");
    EXPECT_EQ(contents(getAll()), (Entries{{"first", "i:1"}}));
    setAll(
        table({{str("second"), str("two")}, {str("plain"), vm.newPlainObject()}, {str("later"), str("x")}}));
    EXPECT_EQ(raised(), kNoType);
    EXPECT_EQ(contents(getAll()), (Entries{{"first", "i:1"}, {"second", "s:two"}}));
    // A table that breaks Hashtable's contract (an entry with a null value) ends the walk there.
    jobject broken = table({{str("third"), vm.newInteger(3)}});
    vm.hashtablePutNullValue(broken, str("empty"));
    vm.hashtablePut(broken, str("never"), str("x"));
    setAll(broken);
    EXPECT_EQ(raised(), "Cannot set registry value to null object");
    EXPECT_EQ(contents(getAll()), (Entries{{"first", "i:1"}, {"second", "s:two"}, {"third", "i:3"}}));
}

TEST_F(Registry, EveryFailureRaisesItsFixedMessage) {
    setRawValue(path);
    const jstring missing = sub("missing"), none = nullptr;
    const jobject one = vm.newInteger(1);
    const std::string tooLongName(20000, 'n');  // Windows refuses names beyond 16383 characters
    const jobject longNamed = table({{str(tooLongName), one}});
    const char kOpen[] = "Unable to open registry key",
               kNullRegistryKey[] = "Cannot work with null registry key",
               kNullObject[] = "Cannot set registry value to null object",
               kNullKey[] = "Cannot work with null key", kCreate[] = "Unable to create/open registry key",
               kSetFailed[] = "Unable to set registry value.  Error in RegSetValueEx() call.";
    const std::pair<std::function<void()>, const char*> cases[] = {
        {[&] { get(str("missing")); }, "RegQueryValueEx() call failed"},
        {[&] { getValue(kCurrentUser, missing, str("x")); }, kOpen},
        {[&] { getValues(kCurrentUser, missing); }, kOpen},
        {[&] { getValues(regkit::kNoSuchRoot, jpath); }, kOpen},
        {[&] { getValue(kCurrentUser, none, str("x")); }, kNullRegistryKey},
        {[&] { getValues(kCurrentUser, none); }, kNullRegistryKey},
        {[&] { set(str("v"), nullptr); }, kNullObject},
        {[&] { setValue(kCurrentUser, none, str("v"), nullptr); }, kNullObject},  // the value is tested first
        {[&] { setValue(kCurrentUser, none, str("v"), one); }, kNullKey},
        {[&] { setValues(kCurrentUser, sub("nullTable"), nullptr); }, kNullObject},
        {[&] { setValues(kCurrentUser, none, vm.newHashtable()); }, kNullKey},
        {[&] { setValue(kCurrentUser, sub("new"), str("v"), vm.newPlainObject()); }, kNoType},
        {[&] { setValue(kCurrentUser, sub("new"), str("v"), vm.newInstance("java/lang/Long")); }, kNoType},
        {[&] { setValue(kCurrentUser, sub("new"), str("v"), vm.newInstance("java/lang/Double")); }, kNoType},
        {[&] { setValue(kCurrentUser, sub("new"), str("v"), vm.newStringArray({})); }, kNoType},
        {[&] { setValue(regkit::kNoSuchRoot, jpath, str("v"), one); }, kCreate},
        {[&] { setValues(regkit::kNoSuchRoot, jpath, vm.newHashtable()); }, kCreate},
        {[&] { set(str(tooLongName), one); }, kSetFailed},
        {[&] { setAll(longNamed); }, kSetFailed},
        {[&] { deleteValue(jpath, str("v")); }, "Unable to delete registry value"},
        {[&] { deleteValue(missing, str("v")); }, kOpen},
        {[&] { deleteValue(none, str("v")); }, kNullRegistryKey},
        {[&] { deleteKey(str(""), false); }, "Invalid registry key"},
        {[&] { deleteKey(none, true); }, kNullRegistryKey},
        {[&] { deleteKey(missing, false); }, "Unable to remove non-empty key"},
        {[&] { deleteKey(missing, true); }, "Unable to delete one or more recursive keys"},
    };
    for (size_t i = 0; i < std::size(cases); ++i) {
        cases[i].first();
        EXPECT_EQ(raised(), cases[i].second) << "case " << i;
    }
    // Nothing was stored; of the keys named, only the one for the unstorable value was created.
    EXPECT_TRUE(valueNames(path).empty());
    EXPECT_EQ(regkit::subKeys(path), 1);
    EXPECT_TRUE(valueNames(path + "\\new").empty());
}

// Each key is opened with no more access than its use needs: a read with KEY_READ, a value
// delete with KEY_WRITE, the emptiness test with query and enumerate, the tree walk with
// DELETE and enumerate; only the writes create with KEY_ALL_ACCESS.
TEST_F(Registry, EachOpenAsksForTheAccessItsUseNeeds) {
    setRawValue(path, "v", REG_DWORD, "\1\0\0\0", 4);
    setRawValue(path + "\\empty");
    setRawValue(path + "\\valued", "v", REG_DWORD, "\1\0\0\0", 4);
    setRawValue(path + "\\tree\\child");
    const std::string open = "open ", create = "create ";
    auto at = [&](const std::string& relative) { return path + "\\" + relative; };
    const std::pair<std::function<void()>, std::vector<std::string>> cases[] = {
        {[&] { get(str("v")); }, {open + path + " 0x20019"}},
        {[&] { getAll(); }, {open + path + " 0x20019"}},
        {[&] { set(str("w"), vm.newInteger(2)); }, {create + path + " 0xf003f"}},
        {[&] {
             setAll(table({{str("w"), vm.newInteger(3)}}));
         },
         {create + path + " 0xf003f"}},
        {[&] { deleteValue(jpath, str("w")); }, {open + path + " 0x20006"}},
        {[&] { deleteKey(sub("empty"), false); }, {open + at("empty") + " 0x9"}},
        // Asked once by the delete and once more by the tree walk, which then opens the key
        // to enumerate it and asks each sub-key in turn.
        {[&] { deleteKey(sub("valued"), true); },
         {open + at("valued") + " 0x9", open + at("valued") + " 0x9", open + at("valued") + " 0x10008"}},
        {[&] { deleteKey(sub("tree"), true); },
         {open + at("tree") + " 0x9", open + at("tree") + " 0x9", open + at("tree") + " 0x10008",
          open + "child 0x9"}},
    };
    for (size_t i = 0; i < std::size(cases); ++i) {
        cases[i].first();
        EXPECT_EQ(raised(), "") << "case " << i;
        std::vector<std::string> seen;
        for (const testkit::registry_spy::KeyOpen& o : testkit::registry_spy::opens()) {
            char mask[16];
            std::snprintf(mask, sizeof mask, " 0x%lx", static_cast<unsigned long>(o.access));
            seen.push_back((o.created ? create : open) + o.subKey + mask);
        }
        EXPECT_EQ(seen, cases[i].second) << "case " << i;
    }
    EXPECT_EQ(regkit::subKeys(path), 0) << "every delete took place";
}

// Every heap allocation a call makes fails in turn: each raises "Out of memory" and returns
// at once, with no key left open and no block left allocated (the fixture checks).
TEST_F(Registry, EachFailedAllocationRaisesOutOfMemory) {
    auto prepare = [&] {
        setRawValue(path, "s", REG_SZ, "text", 5);
        setRawValue(path, "i", REG_DWORD, "\7\0\0\0", 4);
        setRawValue(path, "", REG_BINARY, "\1\2", 2);  // the default value
        setRawValue(path + "\\doomed\\below");
    };
    auto none = [](const std::function<void()>& call) {
        return [call] {
            call();
            return jobject{};
        };
    };
    struct Case {
        const char* what;
        std::function<jobject()> call;
        int allocations;
    };
    const Case cases[] = {
        // Path, name, read buffer, then the string made of it.
        {"text read", [&] { return get(str("s")); }, 4},
        {"number read", [&] { return get(str("i")); }, 3},
        {"default bytes read", [&] { return get(nullptr); }, 2},
        // Path; per value its buffer, a string of a text value, and the name's string.
        {"bulk read", [&] { return getAll(); }, 8},
        {"text write", none([&] { set(str("t"), str("new text")); }), 3},
        {"bulk write", none([&] {
             setAll(table({{str("t"), str("x")}, {str("n"), vm.newInteger(1)}}));
         }),
         4},
        {"value delete", none([&] { deleteValue(jpath, str("s")); }), 2},
        {"tree delete", none([&] { deleteKey(sub("doomed"), true); }), 1},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        prepare();
        c.call();
        EXPECT_EQ(raised(), "");
        ASSERT_EQ(testkit::heap_spy::allocationCount(), c.allocations);
        for (int n = 1; n <= c.allocations; ++n) {
            prepare();
            failAllocationAt = n;
            EXPECT_EQ(c.call(), nullptr) << "allocation " << n;
            EXPECT_EQ(raised(), "Out of memory") << "allocation " << n;
            EXPECT_GT(testkit::heap_spy::failedSize(), 0u) << "allocation " << n << " was not made";
        }
    }
}

// Where a Java-side lookup or construction fails, the bulk calls clear the virtual machine's
// error and raise their fixed message; the value conversions return at once with that error
// pending. Either way nothing is written.
TEST_F(Registry, FailedJavaLookupsRaiseTheFixedMessageOrLeaveTheVirtualMachinesError) {
    set(str("i"), vm.newInteger(5));
    set(str("b"), vm.newByteArray({1}));
    const jobject bulk = table({{str("v"), vm.newInteger(1)}});
    const std::function<void()> read = [&] { EXPECT_EQ(getAll(), nullptr); };
    const std::function<void()> write = [&] { setValues(kCurrentUser, sub("bulk"), bulk); };
    struct Case {
        const char* cls;
        const char* member;  // "": the class lookup fails; "new": the construction fails
        std::function<void()> call;
        const char* expected;  // a CoreUtilException's message, or the class of the VM's own error
    };
    const Case cases[] = {
        {"java/util/Hashtable", "", read, "Unable to find Hashtable class."},
        {"java/util/Hashtable", "<init>", read, "Unable to get function IDs for Hashtable."},
        {"java/util/Hashtable", "put", read, "Unable to get function IDs for Hashtable."},
        {"java/util/Hashtable", "new", read, "Unable to create new Hashtable object."},
        {"java/util/Hashtable", "", write, "Unable to find Hashtable class."},
        {"java/util/Enumeration", "", write, "Unable to find Enumeration class."},
        {"java/util/Hashtable", "keys", write, "Unable to get Hashtable.keys() function."},
        {"java/util/Enumeration", "hasMoreElements", write,
         "Unable to get Enumeration.hasMoreElements() function"},
        {"java/util/Enumeration", "nextElement", write, "Unable to get Enumeration.nextElement() function."},
        {"java/util/Hashtable", "get", write, "Unable to get Hashtable.get() function"},
        {"java/lang/Integer", "<init>", [&] { EXPECT_EQ(get(str("i")), nullptr); },
         "java/lang/NoSuchMethodError"},
        {"[B", "new", read, "java/lang/OutOfMemoryError"},
        {"java/lang/Integer", "intValue", [&] { set(str("i"), vm.newInteger(6)); },
         "java/lang/NoSuchMethodError"},
        {"java/lang/String", "", [&] { set(str("s"), str("x")); }, "java/lang/NoClassDefFoundError"},
        // Without the exception class itself, the virtual machine's own error reaches Java.
        {jnihost::kCoreUtilException, "", [&] { get(str("missing")); }, "java/lang/NoClassDefFoundError"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(std::string(c.cls) + " " + c.member);
        const std::string member = c.member;
        if (member.empty()) {
            vm.failFindClass(c.cls);
        } else if (member == "new") {
            vm.failNewObject(c.cls);
        } else {
            vm.failMemberLookup(c.cls, member);
        }
        c.call();
        vm.clearFailures();
        EXPECT_EQ(std::string(c.expected).rfind("java/", 0) == 0 ? takeException() : raised(), c.expected);
    }
    EXPECT_EQ(vm.integerValue(get(str("i"))), 5);
    EXPECT_EQ(rawValue(path, "s").result, ERROR_FILE_NOT_FOUND);
    EXPECT_TRUE(keyExists(path + "\\bulk")) << "the bulk write creates its key before any lookup";
    EXPECT_TRUE(valueNames(path + "\\bulk").empty());
}

TEST_F(Registry, DeletesRemoveTheirTargetAndRefuseNonEmptyKeysUnlessRecursive) {
    set(str("v"), str("x"));
    deleteValue(jpath, str("v"));
    EXPECT_EQ(rawValue(path, "v").result, ERROR_FILE_NOT_FOUND);
    setRawValue(path + "\\empty");
    deleteKey(sub("empty"), false);
    EXPECT_FALSE(keyExists(path + "\\empty"));
    EXPECT_EQ(raised(), "");

    setValue(kCurrentUser, sub("valued"), str("v"), vm.newInteger(1));
    deleteKey(sub("valued"), false);
    EXPECT_EQ(raised(), "Unable to remove non-empty key");
    EXPECT_EQ(rawValue(path + "\\valued", "v").type, static_cast<DWORD>(REG_DWORD))
        << "a refused key keeps its values";
    deleteKey(sub("valued"), true);
    EXPECT_FALSE(keyExists(path + "\\valued")) << "a key with values but no sub-keys goes with them";

    // Four levels, three keys wide, values at every level above the leaves.
    const std::vector<std::string> leaves = regkit::makeTree(path + "\\tree", 4, 3, true);
    deleteKey(sub("tree"), false);
    EXPECT_EQ(raised(), "Unable to remove non-empty key");
    EXPECT_TRUE(keyExists(leaves.front()));
    // Only the last level of the path goes, with all below it; the levels above stay.
    deleteKey(sub("tree\\k0\\k1"), true);
    EXPECT_EQ(regkit::subKeys(path + "\\tree\\k0"), 2);
    EXPECT_EQ(rawValue(path + "\\tree\\k0", "v").result, ERROR_SUCCESS);
    deleteKey(sub("tree"), true);
    EXPECT_EQ(regkit::subKeys(path), 0);
    EXPECT_EQ(raised(), "");
}

// The Java int is the root key's 32-bit handle value; on 64-bit Windows the predefined keys
// are that value sign-extended (HKEY_CURRENT_USER is 0xFFFFFFFF80000001). Wine would accept a
// zero-extended one too, so the check is on the handle each family hands to ADVAPI32.
TEST_F(Registry, RootKeyReachesTheRegistrySignExtendedFromEveryFamily) {
    setRawValue(path + "\\gone");
    const std::pair<const char*, std::function<void()>> families[] = {
        {"set", [&] { set(str("v"), str("x")); }},
        {"setAll",
         [&] {
             setAll(table({{str("w"), vm.newInteger(2)}}));
         }},
        {"get", [&] { get(str("v")); }},
        {"getAll", [&] { getAll(); }},
        {"deleteValue", [&] { deleteValue(jpath, str("v")); }},
        {"deleteKey", [&] { deleteKey(sub("gone"), false); }},
    };
    for (const auto& [name, run] : families) {
        run();  // the fixture's spies record each export call afresh
        EXPECT_EQ(raised(), "") << name;
        const std::vector<testkit::registry_spy::KeyOpen> opens = testkit::registry_spy::opens();
        ASSERT_FALSE(opens.empty()) << name;
        EXPECT_EQ(opens.front().parent, HKEY_CURRENT_USER) << name;
    }
    EXPECT_FALSE(keyExists(path + "\\gone"));
}

// Volume: 2,000 values in one call each way, and 1,000 keys (1,110 with the inner ones)
// removed in one recursive delete.
TEST_F(Registry, LoadBulkWriteReadAndTreeDelete) {
    jobject written = vm.newHashtable();
    for (int i = 0; i < 2000; ++i) {
        jobject value = i % 3 == 0   ? static_cast<jobject>(str("value " + std::to_string(i)))
                        : i % 3 == 1 ? vm.newInteger(i * 7919)
                                     : vm.newByteArray(Bytes(i % 50, static_cast<uint8_t>(i)));
        vm.hashtablePut(written, str("name" + std::to_string(i)), value);
    }
    setAll(written);
    ASSERT_EQ(raised(), "");
    jobject back = getAll();
    ASSERT_NE(back, nullptr);
    EXPECT_EQ(contents(back), contents(written));

    EXPECT_EQ(regkit::makeTree(path + "\\tree", 3, 10, false).size(), 1000u);
    deleteKey(jpath, true);
    EXPECT_EQ(raised(), "");
    EXPECT_FALSE(keyExists(path));
}

// Under a double-byte ANSI code page (started with a Japanese locale) one character can be
// two bytes; stored text must keep all of them, sized by its converted bytes rather than by
// its count of Java characters.
using RegistryAcp932 = RegistryTest;

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

    jpath = vm.newString(jnihost::utf16(path) + u"\\\u30ad\u30fc");
    set(str("v"), vm.newInteger(1));
    jobject all = getAll();
    ASSERT_NE(all, nullptr);
    EXPECT_EQ(vm.integerValue(vm.hashtableGet(all, str("v"))), 1);
    EXPECT_EQ(raised(), "");
}

}  // namespace
