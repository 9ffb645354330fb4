// Bridge core: the text conversions (linked in directly) and the CoreNativeNT exports.
#include <windows.h>
#include <shlobj.h>
#include <winternl.h>

#include <cstring>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "bridge/text_conversion.h"
#include "host_fixture.h"

namespace {

const char kGetCursorPos[] = "_Java_com_velmor_coreutil_corenative_CoreNativeNT_getCursorPos@8";
const char kSetCursorPos[] = "_Java_com_velmor_coreutil_corenative_CoreNativeNT_setCursorPos@12";
const char kGetEnv[] = "_Java_com_velmor_coreutil_corenative_CoreNativeNT_getEnvVariable@12";
const char kSpecialFolder[] = "_Java_com_velmor_coreutil_corenative_CoreNativeNT_getSpecialFolderLocation@12";

std::string native(JNIEnv* env, jstring s) {
    NativeText text(toNativeString(env, s));
    EXPECT_NE(text, nullptr);
    return text ? std::string(text.get()) : std::string("<null>");
}

POINT cursor() {
    POINT p{-1, -1};
    GetCursorPos(&p);
    return p;
}

// The file a module was loaded from.
std::string modulePath(HMODULE module) {
    char path[MAX_PATH] = {};
    GetModuleFileNameA(module, path, MAX_PATH);
    return path;
}

// The PE data directory `index` as the file on disk declares it (this build's own bitness).
IMAGE_DATA_DIRECTORY dataDirectoryInFile(const std::string& path, int index) {
    std::ifstream in(path, std::ios::binary);
    const std::vector<char> bytes{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    IMAGE_DOS_HEADER dos{};
    IMAGE_NT_HEADERS nt{};
    if (bytes.size() < sizeof dos) {
        return {};
    }
    std::memcpy(&dos, bytes.data(), sizeof dos);
    if (dos.e_magic != IMAGE_DOS_SIGNATURE || bytes.size() < dos.e_lfanew + sizeof nt) {
        return {};
    }
    std::memcpy(&nt, bytes.data() + dos.e_lfanew, sizeof nt);
    return nt.OptionalHeader.DataDirectory[index];
}

// The head of the loader's own record of a module (the part every Windows version shares);
// Flags carries the loader's per-module switches.
struct LoaderEntry {
    LIST_ENTRY inLoadOrder;
    LIST_ENTRY inMemoryOrder;
    LIST_ENTRY inInitializationOrder;
    void* base;
    void* entryPoint;
    ULONG imageSize;
    UNICODE_STRING fullName;
    UNICODE_STRING baseName;
    ULONG flags;
};
constexpr ULONG kNoThreadNotifications = 0x00040000;  // set by DisableThreadLibraryCalls

// The loader's flags of a loaded module, or ~0 when the loader has no record of it.
ULONG loaderFlags(HMODULE module) {
    using QueryProcess = NTSTATUS(WINAPI*)(HANDLE, PROCESSINFOCLASS, void*, ULONG, ULONG*);
    const auto query = reinterpret_cast<QueryProcess>(
        reinterpret_cast<void*>(GetProcAddress(GetModuleHandleA("ntdll.dll"), "NtQueryInformationProcess")));
    PROCESS_BASIC_INFORMATION basic{};
    if (query == nullptr ||
        query(GetCurrentProcess(), ProcessBasicInformation, &basic, sizeof basic, nullptr) != 0) {
        return ~0ul;
    }
    const LIST_ENTRY* head = &basic.PebBaseAddress->Ldr->InMemoryOrderModuleList;
    for (const LIST_ENTRY* link = head->Flink; link != head; link = link->Flink) {
        const auto* entry = CONTAINING_RECORD(link, LoaderEntry, inMemoryOrder);
        if (entry->base == module) {
            return entry->flags;
        }
    }
    return ~0ul;
}

using TextConversion = HostTest;

TEST_F(TextConversion, EmptyTextStaysEmptyNotNull) {
    NativeText text(toNativeString(env(), vm.newString(u"")));
    ASSERT_NE(text, nullptr);
    EXPECT_EQ(text.get()[0], '\0');

    jstring back = toJavaString(env(), "");
    ASSERT_NE(back, nullptr);
    EXPECT_EQ(vm.stringValue(back), u"");
}

TEST_F(TextConversion, CharacterOutsideCodePageBecomesDefaultCharacter) {
    EXPECT_EQ(native(env(), vm.newString(u"a\u4e2d\u00e9b")),
              "a?\xe9"
              "b");
}

TEST_F(TextConversion, EmbeddedNulEndsTheNativeText) {
    const std::u16string withNul(u"ab\0cd", 5);
    NativeText text(toNativeString(env(), vm.newString(withNul)));
    ASSERT_NE(text, nullptr);
    EXPECT_STREQ(text.get(), "ab");
    EXPECT_EQ(std::memcmp(text.get(), "ab\0cd", 6), 0) << "the whole string is converted";
}

TEST_F(TextConversion, CodePageTextRoundTripsByteForByte) {
    std::string all;
    for (int c = 1; c < 256; ++c) {
        char ch = static_cast<char>(c);
        WCHAR w = 0;
        // Only bytes that the code page defines; a few of 0x80-0x9F are unassigned in 1252.
        if (MultiByteToWideChar(CP_ACP, MB_ERR_INVALID_CHARS, &ch, 1, &w, 1) == 1 && !IsDBCSLeadByte(ch)) {
            all.push_back(ch);
        }
    }
    ASSERT_GT(all.size(), 200u);
    jstring java = toJavaString(env(), all.c_str());
    ASSERT_NE(java, nullptr);
    EXPECT_EQ(vm.stringValue(java).size(), all.size());
    EXPECT_EQ(native(env(), java), all);
}

TEST_F(TextConversion, LongTextNeedsNoFixedBuffer) {
    std::u16string text(100000, u'x');
    text += u"end";
    const std::string back = native(env(), vm.newString(text));
    EXPECT_EQ(back.size(), 100003u);
    EXPECT_EQ(vm.stringValue(toJavaString(env(), back.c_str())), text);
}

// Loading the library switches off thread notifications for it, which Windows allows only
// for a module without static TLS.
using EntryPoint = HostTest;

TEST_F(EntryPoint, TheBuiltLibraryHasNoTlsDirectory) {
    const auto module = static_cast<HMODULE>(lib.handle());
    const IMAGE_DATA_DIRECTORY tls = dataDirectoryInFile(modulePath(module), IMAGE_DIRECTORY_ENTRY_TLS);
    EXPECT_EQ(tls.VirtualAddress, 0u);
    EXPECT_EQ(tls.Size, 0u);
}

TEST_F(EntryPoint, ThreadNotificationsAreOffOnceLoaded) {
    const ULONG flags = loaderFlags(static_cast<HMODULE>(lib.handle()));
    ASSERT_NE(flags, ~0ul) << "the loader lists the library";
    EXPECT_TRUE(flags & kNoThreadNotifications);
    // The test program's own modules keep theirs: the flag tells the modules apart.
    EXPECT_FALSE(loaderFlags(GetModuleHandleA(nullptr)) & kNoThreadNotifications);
}

using Cursor = HostTest;

TEST_F(Cursor, SetThenGetReadsThePointBack) {
    EXPECT_EQ(lib.call<jboolean>(kSetCursorPos, jclass{}, vm.newPoint(123, 456)), JNI_TRUE);
    jobject point = lib.call<jobject>(kGetCursorPos, jclass{});
    ASSERT_NE(point, nullptr);
    EXPECT_EQ(vm.classNameOf(point), "java/awt/Point");
    EXPECT_EQ(vm.pointValue(point), std::make_pair(123, 456));
}

TEST_F(Cursor, SubclassOfPointIsReadThroughInheritedFields) {
    EXPECT_EQ(lib.call<jboolean>(kSetCursorPos, jclass{}, vm.newPoint(40, 70, true)), JNI_TRUE);
    EXPECT_EQ(cursor().x, 40);
    EXPECT_EQ(cursor().y, 70);
}

TEST_F(Cursor, NullPointIsRefusedAndCursorStays) {
    SetCursorPos(10, 20);
    EXPECT_EQ(lib.call<jboolean>(kSetCursorPos, jclass{}, jobject{}), JNI_FALSE);
    EXPECT_EQ(cursor().x, 10);
    EXPECT_EQ(cursor().y, 20);
    EXPECT_EQ(vm.callCount("FindClass"), 0);
}

TEST_F(Cursor, MissingPointClassOrMemberLeavesTheErrorPending) {
    SetCursorPos(10, 20);
    vm.failFindClass("java/awt/Point");
    EXPECT_EQ(lib.call<jobject>(kGetCursorPos, jclass{}), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoClassDefFoundError");
    EXPECT_EQ(lib.call<jboolean>(kSetCursorPos, jclass{}, vm.newPoint(1, 2)), JNI_FALSE);
    EXPECT_EQ(takeException(), "java/lang/NoClassDefFoundError");
    vm.clearFailures();

    vm.failMemberLookup("java/awt/Point", "<init>");
    EXPECT_EQ(lib.call<jobject>(kGetCursorPos, jclass{}), nullptr);
    EXPECT_EQ(takeException(), "java/lang/NoSuchMethodError");

    vm.failMemberLookup("java/awt/Point", "y");
    EXPECT_EQ(lib.call<jboolean>(kSetCursorPos, jclass{}, vm.newPoint(1, 2)), JNI_FALSE);
    EXPECT_EQ(takeException(), "java/lang/NoSuchFieldError");
    EXPECT_EQ(cursor().x, 10) << "the cursor must not move on a failed lookup";
}

using Environment = HostTest;

TEST_F(Environment, DefinedVariableComesBack) {
    ASSERT_TRUE(SetEnvironmentVariableA("TESSEL_TEST_VALUE", "some value=1"));
    jstring value = lib.call<jstring>(kGetEnv, jclass{}, vm.newString(u"TESSEL_TEST_VALUE"));
    ASSERT_NE(value, nullptr);
    EXPECT_EQ(vm.stringValue(value), u"some value=1");
}

TEST_F(Environment, UndefinedOrNullNameGivesNull) {
    SetEnvironmentVariableA("TESSEL_TEST_UNDEFINED", nullptr);
    EXPECT_EQ(lib.call<jstring>(kGetEnv, jclass{}, vm.newString(u"TESSEL_TEST_UNDEFINED")), nullptr);
    EXPECT_EQ(lib.call<jstring>(kGetEnv, jclass{}, jstring{}), nullptr);
    EXPECT_FALSE(vm.exceptionPending());
}

TEST_F(Environment, ValueOutsideCodePageComesBackWithDefaultCharacter) {
    ASSERT_TRUE(SetEnvironmentVariableW(L"TESSEL_TEST_WIDE", L"caf\u00e9 \u4e2d"));
    jstring value = lib.call<jstring>(kGetEnv, jclass{}, vm.newString(u"TESSEL_TEST_WIDE"));
    ASSERT_NE(value, nullptr);
    EXPECT_EQ(vm.stringValue(value), u"caf\u00e9 ?");
}

using SpecialFolder = HostTest;

TEST_F(SpecialFolder, DocumentsFolderIsAnExistingPath) {
    jstring path = lib.call<jstring>(kSpecialFolder, jclass{}, jint{CSIDL_PERSONAL});
    ASSERT_NE(path, nullptr);
    const std::string text = jnihost::utf8(vm.stringValue(path));
    ASSERT_GT(text.size(), 3u);
    EXPECT_EQ(text.substr(1, 2), ":\\");
    const DWORD attributes = GetFileAttributesA(text.c_str());
    ASSERT_NE(attributes, INVALID_FILE_ATTRIBUTES) << text;
    EXPECT_TRUE(attributes & FILE_ATTRIBUTE_DIRECTORY);
}

// What the shell itself answers for a folder id: the path of its item list; "<none>" when
// the item list has no file-system path.
std::string shellPathOf(int folderId) {
    ITEMIDLIST* list = nullptr;
    if (FAILED(SHGetSpecialFolderLocation(nullptr, folderId, &list)) || list == nullptr) {
        return "<no item list>";
    }
    char path[MAX_PATH] = {};
    const BOOL found = SHGetPathFromIDListA(list, path);
    ILFree(list);
    return found ? path : "<none>";
}

// Wine's shell ends the documents folder's path with a backslash, where SHGetFolderPathA
// gives none; the library hands on the item list's path exactly as the shell gave it.
TEST_F(SpecialFolder, PathIsTheShellsTextAsGivenTrailingBackslashIncluded) {
    char folderPath[MAX_PATH] = {};
    ASSERT_EQ(SHGetFolderPathA(nullptr, CSIDL_PERSONAL, nullptr, 0, folderPath), S_OK);
    const std::string shell = shellPathOf(CSIDL_PERSONAL);
    ASSERT_EQ(shell, std::string(folderPath) + "\\") << "the test bed's shell gives the backslash";
    jstring path = lib.call<jstring>(kSpecialFolder, jclass{}, jint{CSIDL_PERSONAL});
    ASSERT_NE(path, nullptr);
    EXPECT_EQ(jnihost::utf8(vm.stringValue(path)), shell);
}

// Control Panel, My Computer and the Recycle Bin: the shell has an item list for each, but
// no file-system path.
TEST_F(SpecialFolder, VirtualFolderGivesNull) {
    for (int id : {CSIDL_CONTROLS, CSIDL_DRIVES, CSIDL_BITBUCKET}) {
        ASSERT_EQ(shellPathOf(id), "<none>") << id;
        EXPECT_EQ(lib.call<jstring>(kSpecialFolder, jclass{}, jint{id}), nullptr) << id;
    }
}

TEST_F(SpecialFolder, UnknownIdGivesNull) {
    EXPECT_EQ(lib.call<jstring>(kSpecialFolder, jclass{}, jint{0x7ff0}), nullptr);
    EXPECT_EQ(lib.call<jstring>(kSpecialFolder, jclass{}, jint{-1}), nullptr);
}

// Under a double-byte ANSI code page (started with a Japanese locale), sizes are bytes.
using Acp932 = HostTest;

TEST_F(Acp932, ConversionsSizeByBytesNotCharacters) {
    if (GetACP() != 932) {
        GTEST_SKIP() << "needs ANSI code page 932; ctest runs this under a Japanese locale";
    }
    const std::u16string kanji = u"\u65e5\u672c\u8a9e-x";  // three kanji, two bytes each
    const std::string text = native(env(), vm.newString(kanji));
    EXPECT_EQ(text.size(), 8u);
    EXPECT_EQ(vm.stringValue(toJavaString(env(), text.c_str())), kanji);
}

TEST_F(Acp932, DoubleByteVariableNameIsFound) {
    if (GetACP() != 932) {
        GTEST_SKIP() << "needs ANSI code page 932";
    }
    ASSERT_TRUE(SetEnvironmentVariableW(L"TESSEL_\u65e5\u672c", L"ascii value"));
    jstring value = lib.call<jstring>(kGetEnv, jclass{}, vm.newString(u"TESSEL_\u65e5\u672c"));
    ASSERT_NE(value, nullptr);
    EXPECT_EQ(vm.stringValue(value), u"ascii value");
}

}  // namespace
