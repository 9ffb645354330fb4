// Choosers: the open/save dialogs and the folder browser shown for real under Wine, driven
// from a second thread as a person would, plus their helpers linked in directly. The
// library's calls of a few Windows functions are observed through its import table.
#include <windows.h>
#include <commdlg.h>
#include <dlgs.h>
#include <malloc.h>
#include <objbase.h>
#include <shlobj.h>
#include <commctrl.h>

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "bridge/text_conversion.h"
#include "choosers/chooser_window.h"
#include "choosers/file_dialogs.h"
#include "host_fixture.h"

namespace {

const char kActivate[] = "_Java_com_velmor_coreutil_hack_HackWindowsFileChooser_nativeActivateWindow@16";
const char kOpen[] = "_Java_com_velmor_coreutil_hack_HackWindowsFileChooser_nativeBrowseForFile@28";
const char kSave[] = "_Java_com_velmor_coreutil_hack_HackWindowsFileChooser_nativeBrowseForSaveFile@28";
const char kBrowse[] = "_Java_com_velmor_coreutil_hack_HackWindowsDirectoryChooser_nativeBrowseForFolder@8";
const char kSetStatus[] = "_Java_com_velmor_coreutil_hack_HackWindowsDirectoryChooser_nativeSetStatus@12";

constexpr DWORD kDialogTimeoutMs = 15000;

// ---- What the library hands to Windows, seen through its import table ----

struct FileDialogCall {
    DWORD structSize, flags, filterIndex, maxFile;
    HWND owner;
    std::string filter, initialDir, title;  // the filter up to its closing double NUL
};
struct BrowseCall {
    HWND owner;
    UINT flags;
    std::string title;
};
struct SentMessage {
    HWND window;
    UINT message;
    WPARAM wParam;
    LPARAM lParam;
    std::string text;  // for the messages that carry one
    bool okEnabledAfter;
};
struct Spy {
    std::mutex mu;
    std::vector<FileDialogCall> fileDialogs;
    std::vector<BrowseCall> browses;
    std::vector<SentMessage> sent;
    std::vector<HWND> raised;  // SetWindowPos targets
};
Spy spy;

std::string textOf(const char* text) {
    return text ? text : "<null>";
}

void recordFileDialog(const OPENFILENAMEA* dialog) {
    FileDialogCall call{dialog->lStructSize,
                        dialog->Flags,
                        dialog->nFilterIndex,
                        dialog->nMaxFile,
                        dialog->hwndOwner,
                        std::string("<null>"),
                        textOf(dialog->lpstrInitialDir),
                        textOf(dialog->lpstrTitle)};
    if (dialog->lpstrFilter != nullptr) {
        const char* p = dialog->lpstrFilter;
        while (p[0] != '\0' || p[1] != '\0') {
            ++p;
        }
        call.filter.assign(dialog->lpstrFilter, p + 2);
    }
    std::lock_guard<std::mutex> lock(spy.mu);
    spy.fileDialogs.push_back(call);
}

BOOL WINAPI spyGetOpenFileName(LPOPENFILENAMEA dialog) {
    recordFileDialog(dialog);
    return GetOpenFileNameA(dialog);
}
BOOL WINAPI spyGetSaveFileName(LPOPENFILENAMEA dialog) {
    recordFileDialog(dialog);
    return GetSaveFileNameA(dialog);
}
PIDLIST_ABSOLUTE WINAPI spyBrowseForFolder(LPBROWSEINFOA browse) {
    {
        std::lock_guard<std::mutex> lock(spy.mu);
        spy.browses.push_back({browse->hwndOwner, browse->ulFlags, textOf(browse->lpszTitle)});
    }
    return SHBrowseForFolderA(browse);
}
LRESULT WINAPI spySendMessage(HWND window, UINT message, WPARAM wParam, LPARAM lParam) {
    {
        // Recorded before sending: a selection sent here comes back as ENABLEOK on this thread.
        std::lock_guard<std::mutex> lock(spy.mu);
        const bool carriesText = message == BFFM_SETSTATUSTEXTA || message == BFFM_SETSELECTIONA;
        spy.sent.push_back({window, message, wParam, lParam,
                            carriesText ? textOf(reinterpret_cast<const char*>(lParam)) : std::string(),
                            false});
    }
    const LRESULT result = SendMessageA(window, message, wParam, lParam);
    if (message == BFFM_ENABLEOK) {
        // What the message did to the button, seen before the dialog goes on.
        const bool enabled = IsWindowEnabled(GetDlgItem(window, IDOK)) != FALSE;
        std::lock_guard<std::mutex> lock(spy.mu);
        for (auto m = spy.sent.rbegin(); m != spy.sent.rend(); ++m) {
            if (m->message == BFFM_ENABLEOK && m->window == window) {
                m->okEnabledAfter = enabled;
                break;
            }
        }
    }
    return result;
}
BOOL WINAPI spySetWindowPos(HWND window, HWND after, int x, int y, int cx, int cy, UINT flags) {
    {
        std::lock_guard<std::mutex> lock(spy.mu);
        spy.raised.push_back(window);
    }
    return SetWindowPos(window, after, x, y, cx, cy, flags);
}

std::vector<SentMessage> sentMessages(UINT message) {
    std::lock_guard<std::mutex> lock(spy.mu);
    std::vector<SentMessage> found;
    for (const SentMessage& m : spy.sent) {
        if (m.message == message) {
            found.push_back(m);
        }
    }
    return found;
}

// Points one imported function of the module at a replacement.
bool patchImport(HMODULE module, const char* function, void* replacement) {
    auto* base = reinterpret_cast<BYTE*>(module);
    auto* nt =
        reinterpret_cast<IMAGE_NT_HEADERS32*>(base + reinterpret_cast<IMAGE_DOS_HEADER*>(base)->e_lfanew);
    const IMAGE_DATA_DIRECTORY& dir = nt->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_IMPORT];
    for (auto* d = reinterpret_cast<IMAGE_IMPORT_DESCRIPTOR*>(base + dir.VirtualAddress); d->Name != 0; ++d) {
        auto* names = reinterpret_cast<IMAGE_THUNK_DATA32*>(base + d->OriginalFirstThunk);
        auto* slots = reinterpret_cast<IMAGE_THUNK_DATA32*>(base + d->FirstThunk);
        for (; names->u1.AddressOfData != 0; ++names, ++slots) {
            if (IMAGE_SNAP_BY_ORDINAL32(names->u1.Ordinal) ||
                std::strcmp(reinterpret_cast<IMAGE_IMPORT_BY_NAME*>(base + names->u1.AddressOfData)->Name,
                            function) != 0) {
                continue;
            }
            DWORD old = 0;
            VirtualProtect(&slots->u1.Function, sizeof(DWORD), PAGE_READWRITE, &old);
            slots->u1.Function = reinterpret_cast<DWORD>(replacement);
            VirtualProtect(&slots->u1.Function, sizeof(DWORD), old, &old);
            return true;
        }
    }
    return false;
}

// ---- Driving a dialog from a second thread ----

HWND handleOf(jnihost::Vm& vm, jobject chooser) {
    return windowFromJava(vm.longField(chooser, "hwnd"));
}

bool isDialog(HWND window) {
    char name[16] = {};
    GetClassNameA(window, name, sizeof name);
    return std::strcmp(name, "#32770") == 0 && IsWindowVisible(window);
}

// Waits until the dialog is shown: through "hwnd", or, when the library could not write
// it, as the dialog thread's visible dialog. Null after the timeout.
HWND waitForDialog(const std::function<HWND()>& find) {
    for (DWORD waited = 0; waited < kDialogTimeoutMs; waited += 20) {
        HWND dialog = find();
        if (dialog != nullptr && isDialog(dialog)) {
            Sleep(300);  // let it paint before anyone looks at it
            return dialog;
        }
        Sleep(20);
    }
    return nullptr;
}

BOOL CALLBACK takeDialog(HWND window, LPARAM out) {
    if (!isDialog(window)) {
        return TRUE;
    }
    *reinterpret_cast<HWND*>(out) = window;
    return FALSE;
}

HWND dialogOfThread(DWORD thread) {
    HWND found = nullptr;
    EnumThreadWindows(thread, takeDialog, reinterpret_cast<LPARAM>(&found));
    return found;
}

void press(HWND dialog, int button) {
    PostMessageA(dialog, WM_COMMAND, MAKEWPARAM(button, BN_CLICKED), 0);
}

// Shows a dialog on this thread while `steps` run on a second one. Whatever the steps do or
// fail to do, a dialog still open when they end is cancelled, so the test never hangs.
template <class Show>
auto showWhileDriving(Show show, std::function<void()> steps) {
    const DWORD dialogThread = GetCurrentThreadId();
    std::atomic<bool> returned{false};
    std::thread driver([&] {
        steps();
        while (!returned) {
            if (HWND leftOver = dialogOfThread(dialogThread)) {
                press(leftOver, IDCANCEL);
            }
            Sleep(100);
        }
    });
    auto result = show();
    returned = true;
    driver.join();
    return result;
}

// Centred on the point by integer halves of its size, never at a negative coordinate.
void expectCentredOn(HWND dialog, int cx, int cy) {
    RECT frame{};
    ASSERT_TRUE(GetWindowRect(dialog, &frame));
    EXPECT_EQ(frame.left, std::max(0L, cx - (frame.right - frame.left) / 2));
    EXPECT_EQ(frame.top, std::max(0L, cy - (frame.bottom - frame.top) / 2));
}

// A PNG of the Xvfb screen in $TESSEL_BUILD/screenshots, for a person to look at. Wine
// runs a Unix program directly; the file appears once the screen has been captured, and
// only then may the dialog go away.
void saveScreenshot(const char* name) {
    char display[64] = {}, build[MAX_PATH] = {};
    if (!GetEnvironmentVariableA("DISPLAY", display, sizeof display) ||
        !GetEnvironmentVariableA("TESSEL_BUILD", build, sizeof build)) {
        return;
    }
    const std::string folder = std::string(build) + "/screenshots";
    const std::string file = folder + "/" + name + ".png";
    CreateDirectoryA(("Z:" + folder).c_str(), nullptr);
    DeleteFileA(("Z:" + file).c_str());
    std::string command = "import -window root -display " + std::string(display) + " " + file;
    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION process{};
    if (!CreateProcessA("Z:\\usr\\bin\\import", &command[0], nullptr, nullptr, FALSE, 0, nullptr, nullptr,
                        &startup, &process)) {
        std::printf("screenshot %s not taken\n", name);
        return;
    }
    // A Unix process comes without handles to wait on.
    if (process.hProcess != nullptr) {
        CloseHandle(process.hThread);
        CloseHandle(process.hProcess);
    }
    for (int waited = 0; waited < 5000; waited += 50) {
        if (GetFileAttributesA(("Z:" + file).c_str()) != INVALID_FILE_ATTRIBUTES) {
            Sleep(200);  // let it finish writing
            return;
        }
        Sleep(50);
    }
    std::printf("screenshot %s not written\n", name);
}

struct TextSearch {
    std::string text;
    bool found;
};

BOOL CALLBACK matchText(HWND child, LPARAM parameter) {
    auto* search = reinterpret_cast<TextSearch*>(parameter);
    char buffer[256] = {};
    GetWindowTextA(child, buffer, sizeof buffer);
    search->found = search->found || search->text == buffer;
    return TRUE;
}

// The text when one of the dialog's controls shows it, or empty.
std::string childWithText(HWND dialog, const std::string& text) {
    TextSearch search{text, false};
    EnumChildWindows(dialog, matchText, reinterpret_cast<LPARAM>(&search));
    return search.found ? text : std::string();
}

HWND createTopLevel(bool visible, int x = 0, int y = 0, int width = 200, int height = 100) {
    return CreateWindowExA(0, "STATIC", "tessel test window", WS_POPUP | (visible ? WS_VISIBLE : 0), x, y,
                           width, height, nullptr, nullptr, GetModuleHandleA(nullptr), nullptr);
}

class ChooserTest : public HostTest {
protected:
    void SetUp() override {
        CoInitialize(nullptr);  // the folder browser's thread must have COM
        {
            std::lock_guard<std::mutex> lock(spy.mu);
            spy.fileDialogs.clear();
            spy.browses.clear();
            spy.sent.clear();
            spy.raised.clear();
        }
        auto* module = static_cast<HMODULE>(lib.handle());
        ASSERT_NE(module, nullptr);
        ASSERT_TRUE(patchImport(module, "GetOpenFileNameA", reinterpret_cast<void*>(spyGetOpenFileName)));
        ASSERT_TRUE(patchImport(module, "GetSaveFileNameA", reinterpret_cast<void*>(spyGetSaveFileName)));
        ASSERT_TRUE(patchImport(module, "SHBrowseForFolderA", reinterpret_cast<void*>(spyBrowseForFolder)));
        ASSERT_TRUE(patchImport(module, "SendMessageA", reinterpret_cast<void*>(spySendMessage)));
        ASSERT_TRUE(patchImport(module, "SetWindowPos", reinterpret_cast<void*>(spySetWindowPos)));

        folder = "C:\\tessel-choosers-" + std::to_string(GetCurrentProcessId());
        CreateDirectoryA(folder.c_str(), nullptr);
        for (const char* sub : {"start", "blocked", "good"}) {
            CreateDirectoryA(path(sub).c_str(), nullptr);
        }
        for (const char* file : {"a.txt", "b.txt"}) {
            CloseHandle(
                CreateFileA(path(file).c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr));
        }
    }
    void TearDown() override {
        // The file dialogs leave the process in the folder last shown, which Windows will
        // not remove.
        SetCurrentDirectoryA("C:\\");
        for (const char* file : {"a.txt", "b.txt"}) {
            DeleteFileA(path(file).c_str());
        }
        for (const char* sub : {"start", "blocked", "good"}) {
            RemoveDirectoryA(path(sub).c_str());
        }
        RemoveDirectoryA(folder.c_str());
        CoUninitialize();
    }

    std::string path(const char* name) const { return folder + "\\" + name; }
    jstring jstr(const std::string& text) { return vm.newStringUtf8(text); }
    std::vector<std::string> strings(jobject array) {
        std::vector<std::string> out;
        if (array != nullptr) {
            for (jobject s : vm.objectArrayValue(array)) {
                out.push_back(s ? vm.stringUtf8(s) : "<null>");
            }
        }
        return out;
    }

    jobject fileChooser(int cx, int cy) {
        jobject chooser = vm.newInstance(jnihost::kFileChooserClass);
        vm.setLongField(chooser, "centerx", cx);
        vm.setLongField(chooser, "centery", cy);
        return chooser;
    }
    jobject openDialog(const char* exportName, jobject chooser, jobjectArray filters, bool multiple) {
        return lib.call<jobject>(exportName, chooser, filters, jint{2}, jstr(folder), jstr("Pick files"),
                                 jboolean(multiple ? JNI_TRUE : JNI_FALSE));
    }
    // Types a name into the file name box and presses OK.
    static void choose(HWND dialog, const char* typed) {
        SendMessageA(dialog, CDM_SETCONTROLTEXT, edt1, reinterpret_cast<LPARAM>(typed));
        press(dialog, IDOK);
    }
    // Clicks a folder of the tree as a person would, opening My Computer, C: and the test's
    // folder on the way. Selecting by path with BFFM_SETSELECTION is left to the library:
    // Wine matches a path against its tree by comparing item ID lists byte for byte, and
    // now and then leaves a folder that is plainly there unselected.
    bool select(HWND dialog, const std::string& folderPath) const {
        HWND tree = FindWindowExA(dialog, nullptr, WC_TREEVIEWA, nullptr);
        const std::string name = folderPath.substr(folderPath.rfind('\\') + 1);
        HTREEITEM item = TreeView_GetRoot(tree);
        for (const std::string& step :
             {std::string("My Computer"), std::string("(C:)"), folder.substr(3), name}) {
            TreeView_Expand(tree, item, TVE_EXPAND);
            HTREEITEM child = TreeView_GetChild(tree, item);
            while (child != nullptr && itemText(tree, child).find(step) == std::string::npos) {
                child = TreeView_GetNextSibling(tree, child);
            }
            if (child == nullptr) {
                return false;
            }
            item = child;
        }
        return TreeView_SelectItem(tree, item) && treeSelection(dialog) == name;
    }
    static std::string itemText(HWND tree, HTREEITEM handle) {
        char text[MAX_PATH] = {};
        TVITEMA item{};
        item.mask = TVIF_TEXT;
        item.hItem = handle;
        item.pszText = text;
        item.cchTextMax = sizeof text;
        SendMessageA(tree, TVM_GETITEMA, 0, reinterpret_cast<LPARAM>(&item));
        return text;
    }
    static std::string treeSelection(HWND dialog) {
        HWND tree = FindWindowExA(dialog, nullptr, WC_TREEVIEWA, nullptr);
        HTREEITEM caret = TreeView_GetSelection(tree);
        return caret != nullptr ? itemText(tree, caret) : std::string();
    }
    static bool okEnabled(HWND dialog) { return IsWindowEnabled(GetDlgItem(dialog, IDOK)) != FALSE; }

    std::string folder;
};

// ---- Helpers, without a dialog ----

using FilterList = HostTest;

TEST_F(FilterList, PairsBecomeNulSeparatedTextsWithFourMoreNuls) {
    bool failed = true;
    HeapBlock<char> list(
        buildFilterList(env(),
                        vm.newStringArray({vm.newStringUtf8("Text files"), vm.newStringUtf8("*.txt"),
                                           vm.newStringUtf8("All files"), vm.newStringUtf8("*.*")}),
                        &failed));
    ASSERT_NE(list, nullptr);
    EXPECT_FALSE(failed);
    EXPECT_EQ(_msize(list.get()), 35u);
    EXPECT_EQ(std::string(list.get(), 35), std::string("Text files\0*.txt\0All files\0*.*\0\0\0\0\0", 35));
}

TEST_F(FilterList, NullElementsAreSkippedAndEmptyOnesEndTheList) {
    bool failed = true;
    HeapBlock<char> list(buildFilterList(
        env(), vm.newStringArray({nullptr, vm.newStringUtf8("A"), nullptr, vm.newStringUtf8("*.a")}),
        &failed));
    ASSERT_NE(list, nullptr);
    EXPECT_EQ(_msize(list.get()), 4u + 4 + 4);
    EXPECT_EQ(std::string(list.get(), 12), std::string("A\0*.a\0\0\0\0\0\0\0", 12));

    list.reset(
        buildFilterList(env(), vm.newStringArray({vm.newStringUtf8(""), vm.newStringUtf8("*.a")}), &failed));
    ASSERT_NE(list, nullptr);
    EXPECT_EQ(std::string(list.get(), 5), std::string("\0*.a\0", 5))
        << "Windows reads the lone NUL as the end";

    for (jobjectArray none : {static_cast<jobjectArray>(nullptr), vm.newStringArray({}),
                              vm.newStringArray({nullptr, vm.newStringUtf8(""), nullptr})}) {
        EXPECT_EQ(buildFilterList(env(), none, &failed), nullptr);
        EXPECT_FALSE(failed);
    }
}

using Selection = HostTest;

TEST_F(Selection, JoinsFolderAndNamesAtTheirRealLength) {
    auto convert = [&](const std::string& written) {
        std::string buffer = written + std::string(16, '\0');
        OPENFILENAMEA dialog{};
        dialog.lpstrFile = &buffer[0];
        dialog.nMaxFile = static_cast<DWORD>(buffer.size());
        std::vector<std::string> out;
        jobjectArray paths = selectionToJava(env(), dialog);
        EXPECT_NE(paths, nullptr);
        for (jobject s : paths ? vm.objectArrayValue(paths) : std::vector<jobject>{}) {
            out.push_back(vm.stringUtf8(s));
        }
        return out;
    };
    using Paths = std::vector<std::string>;
    EXPECT_EQ(convert(std::string("C:\\dir\\one.txt", 14)), Paths{"C:\\dir\\one.txt"});
    EXPECT_EQ(convert(std::string("C:\\\0a.txt\0b.txt\0", 16)), (Paths{"C:\\\\a.txt", "C:\\\\b.txt"}));
    EXPECT_EQ(convert(""), Paths{});

    // 200 + 1 + 100 bytes: longer than MAX_PATH, and still whole.
    const std::string longFolder = "C:\\" + std::string(197, 'd');
    const std::string longName = std::string(96, 'n') + ".txt";
    EXPECT_EQ(convert(longFolder + '\0' + longName + '\0' + "x" + '\0'),
              (Paths{longFolder + "\\" + longName, longFolder + "\\x"}));
}

using Placement = HostTest;

TEST_F(Placement, CentresOnTheObjectsPointAndStoresTheHandleSignExtended) {
    HWND window = createTopLevel(true, 10, 10, 400, 301);
    ASSERT_NE(window, nullptr);
    jobject chooser = vm.newInstance(jnihost::kDirectoryChooserClass);
    vm.setLongField(chooser, "centerx", 1000 + (int64_t{7} << 32));  // only the low half counts
    vm.setLongField(chooser, "centery", 500);
    centerWindowAt(env(), chooser, kDirectoryChooserClass, window);
    RECT frame{};
    GetWindowRect(window, &frame);
    EXPECT_EQ(frame.left, 800);
    EXPECT_EQ(frame.top, 350);
    EXPECT_EQ(frame.right - frame.left, 400);

    vm.setLongField(chooser, "centerx", 100);  // nearer the edge than half the width
    vm.setLongField(chooser, "centery", -5);
    centerWindowAt(env(), chooser, kDirectoryChooserClass, window);
    GetWindowRect(window, &frame);
    EXPECT_EQ(frame.left, 0);
    EXPECT_EQ(frame.top, 0);
    DestroyWindow(window);

    storeWindowHandle(env(), chooser, kDirectoryChooserClass, reinterpret_cast<HWND>(0x80001234u));
    EXPECT_EQ(vm.longField(chooser, "hwnd"), int64_t{-0x7fffedcc});
}

TEST_F(Placement, OwnerIsTheFirstWindowOfTheProcessEvenWhenHidden) {
    HWND hidden = createTopLevel(false);
    ASSERT_NE(hidden, nullptr);
    EXPECT_EQ(findProcessWindow(GetCurrentProcessId()), hidden);
    DestroyWindow(hidden);
}

using ActivateWindow = ChooserTest;

TEST_F(ActivateWindow, RaisesByTheLowHalfAndIgnoresZero) {
    HWND first = createTopLevel(true, 0, 0);
    HWND second = createTopLevel(true, 50, 50);
    SetForegroundWindow(second);
    lib.call<void>(kActivate, jclass{}, jlong{0});
    lib.call<void>(kActivate, jclass{}, jlong{1} << 32);
    EXPECT_TRUE(spy.raised.empty());
    EXPECT_EQ(GetForegroundWindow(), second);

    const auto low = static_cast<uint32_t>(reinterpret_cast<uintptr_t>(first));
    lib.call<void>(kActivate, jclass{}, static_cast<jlong>((uint64_t{0xdeadbeef} << 32) | low));
    EXPECT_EQ(spy.raised, std::vector<HWND>{first});
    EXPECT_EQ(GetForegroundWindow(), first);
    DestroyWindow(first);
    DestroyWindow(second);
}

// ---- The file dialogs ----

using FileDialog = ChooserTest;

TEST_F(FileDialog, SingleSelectionWithAndWithoutMultipleAllowed) {
    jobjectArray filters =
        vm.newStringArray({jstr("Text files"), jstr("*.txt"), jstr("All files"), jstr("*.*")});
    for (bool multiple : {false, true}) {
        jobject chooser = fileChooser(640, 400);
        HWND shown = nullptr;
        jobject result = showWhileDriving([&] { return openDialog(kOpen, chooser, filters, multiple); },
                                          [&] {
                                              shown = waitForDialog([&] { return handleOf(vm, chooser); });
                                              if (shown == nullptr) {
                                                  return;
                                              }
                                              expectCentredOn(shown, 640, 400);
                                              if (!multiple) {
                                                  saveScreenshot("open-dialog");
                                              }
                                              choose(shown, "a.txt");
                                          });
        ASSERT_NE(shown, nullptr) << "the hook never stored the dialog's handle";
        EXPECT_EQ(strings(result), std::vector<std::string>{path("a.txt")});
        EXPECT_EQ(vm.longField(chooser, "hwnd"), static_cast<int32_t>(reinterpret_cast<intptr_t>(shown)));
    }
    ASSERT_EQ(spy.fileDialogs.size(), 2u);
    for (const FileDialogCall& call : spy.fileDialogs) {
        EXPECT_EQ(call.structSize, 76u);
        EXPECT_EQ(call.owner, nullptr);
        EXPECT_EQ(call.filter, std::string("Text files\0*.txt\0All files\0*.*\0\0", 32));
        EXPECT_EQ(call.filterIndex, 2u);
        EXPECT_EQ(call.maxFile, 10000u);
        EXPECT_EQ(call.initialDir, folder);
        EXPECT_EQ(call.title, "Pick files");
    }
    EXPECT_EQ(spy.fileDialogs[0].flags, 0x81824u);
    EXPECT_EQ(spy.fileDialogs[1].flags, 0x81A24u);
}

TEST_F(FileDialog, TwoFilesInOneFolderComeBackJoined) {
    jobject chooser = fileChooser(300, 900);
    jobject result = showWhileDriving([&] { return openDialog(kOpen, chooser, nullptr, true); },
                                      [&] {
                                          HWND shown = waitForDialog([&] { return handleOf(vm, chooser); });
                                          if (shown != nullptr) {
                                              expectCentredOn(shown, 300, 900);
                                              choose(shown, "\"a.txt\" \"b.txt\"");
                                          }
                                      });
    EXPECT_EQ(strings(result), (std::vector<std::string>{path("a.txt"), path("b.txt")}));
    ASSERT_EQ(spy.fileDialogs.size(), 1u);
    EXPECT_EQ(spy.fileDialogs[0].filter, "<null>") << "a null filter array means no filter";
}

TEST_F(FileDialog, MissingCentreFieldPlacesTheDialogAtTheOriginAndItsErrorReachesJava) {
    vm.failMemberLookup(jnihost::kFileChooserClass, "centerx");
    jobject chooser = fileChooser(640, 400);
    const DWORD dialogThread = GetCurrentThreadId();
    jobject result = showWhileDriving([&] { return openDialog(kOpen, chooser, nullptr, false); },
                                      [&] {
                                          HWND shown =
                                              waitForDialog([&] { return dialogOfThread(dialogThread); });
                                          ASSERT_NE(shown, nullptr);
                                          expectCentredOn(shown, 0, 0);
                                          choose(shown, "a.txt");
                                      });
    EXPECT_EQ(result, nullptr) << "Java sees the pending error instead of a result";
    EXPECT_EQ(takeException(), "java/lang/NoSuchFieldError");
    EXPECT_EQ(vm.longField(chooser, "hwnd"), 0) << "no write while the error is pending";
}

// ---- Cancel, all three dialogs ----

using Cancel = ChooserTest;

TEST_F(Cancel, GivesNullFromAllThreeDialogs) {
    auto cancelOnce = [&](jobject chooser, const char* screenshot) {
        return [&vm = vm, chooser, screenshot] {
            HWND shown = waitForDialog([&] { return handleOf(vm, chooser); });
            ASSERT_NE(shown, nullptr);
            saveScreenshot(screenshot);
            press(shown, IDCANCEL);
        };
    };
    jobject open = fileChooser(400, 300);
    EXPECT_EQ(showWhileDriving([&] { return openDialog(kOpen, open, nullptr, false); },
                               cancelOnce(open, "open-dialog-cancel")),
              nullptr);

    jobject save = fileChooser(900, 600);
    EXPECT_EQ(showWhileDriving([&] { return openDialog(kSave, save, vm.newStringArray({}), true); },
                               cancelOnce(save, "save-dialog")),
              nullptr);
    ASSERT_EQ(spy.fileDialogs.size(), 2u);
    EXPECT_EQ(spy.fileDialogs[1].flags, 0x81A24u) << "the save dialog gets the same flags";

    jobject directory = vm.newInstance(jnihost::kDirectoryChooserClass);
    EXPECT_EQ(showWhileDriving([&] { return lib.call<jstring>(kBrowse, directory); },
                               cancelOnce(directory, "folder-browser-cancel")),
              nullptr);
    EXPECT_EQ(takeException(), "");
}

// ---- The folder browser ----

using FolderBrowser = ChooserTest;

TEST_F(FolderBrowser, ValidatorStatusLineStartPathAndChosenFolder) {
    std::mutex mu;
    std::vector<std::string> asked;
    jobject chooser = vm.newInstance(jnihost::kDirectoryChooserClass);
    vm.setLongField(chooser, "centerx", 100);  // nearer the left edge than half the width
    vm.setLongField(chooser, "centery", 600);
    vm.setObjectField(chooser, "title", jstr("Pick a folder"));
    vm.setLongField(chooser, "browseFlags", BIF_STATUSTEXT | (int64_t{1} << 40));
    vm.setObjectField(chooser, "startpath", jstr(path("start")));
    vm.setObjectField(chooser, "validator", vm.newValidator([&](JNIEnv*, const std::string& folderPath) {
        std::lock_guard<std::mutex> lock(mu);
        asked.push_back(folderPath);
        return folderPath.find("blocked") == std::string::npos;
    }));

    std::string startSelection, status;
    bool selected = false;
    jstring result = showWhileDriving([&] { return lib.call<jstring>(kBrowse, chooser); },
                                      [&] {
                                          HWND shown = waitForDialog([&] { return handleOf(vm, chooser); });
                                          ASSERT_NE(shown, nullptr);
                                          expectCentredOn(shown, 100, 600);
                                          startSelection = treeSelection(shown);
                                          if (startSelection != "start") {
                                              std::printf("Wine left the start selection undone\n");
                                              select(shown, path("start"));
                                          }
                                          // From this thread, with its own env.
                                          lib.call<void>(kSetStatus, chooser, static_cast<jstring>(nullptr));
                                          lib.call<void>(kSetStatus, chooser, jstr("Checking the folder"));
                                          status = childWithText(shown, "Checking the folder");
                                          selected =
                                              select(shown, path("blocked")) && select(shown, path("good"));
                                          saveScreenshot("folder-browser");
                                          press(shown, IDOK);
                                      });
    ASSERT_NE(result, nullptr);
    EXPECT_EQ(vm.stringUtf8(result), path("good"));
    EXPECT_TRUE(selected);
    EXPECT_EQ(asked, (std::vector<std::string>{path("start"), path("blocked"), path("good")}));
    // Wine's dialog checks the selection itself once the callback has returned and enables
    // OK for any folder, so the button is read right after each of the library's messages.
    const std::vector<SentMessage> enable = sentMessages(BFFM_ENABLEOK);
    ASSERT_EQ(enable.size(), 3u);
    for (size_t i = 0; i < enable.size(); ++i) {
        const bool valid = i != 1;
        EXPECT_EQ(enable[i].lParam, valid ? 1 : 0) << i;
        EXPECT_EQ(enable[i].okEnabledAfter, valid) << i;
    }
    EXPECT_EQ(status, "Checking the folder");
    EXPECT_EQ(sentMessages(BFFM_SETSTATUSTEXTA).size(), 1u) << "a null text sends nothing";
    ASSERT_EQ(sentMessages(BFFM_SETSELECTIONA).size(), 1u);
    EXPECT_EQ(sentMessages(BFFM_SETSELECTIONA)[0].text, path("start"));
    ASSERT_EQ(spy.browses.size(), 1u);
    EXPECT_EQ(spy.browses[0].flags, UINT{BIF_STATUSTEXT}) << "only the low 32 bits of browseFlags";
    EXPECT_EQ(spy.browses[0].title, "Pick a folder");
}

TEST_F(FolderBrowser, WithoutValidatorOwnedByTheHiddenWindowAndStatusOnlyToALiveDialog) {
    HWND hidden = createTopLevel(false);
    ASSERT_NE(hidden, nullptr);
    jobject chooser = vm.newInstance(jnihost::kDirectoryChooserClass);
    vm.setObjectField(chooser, "startpath", jstr(path("start")));
    lib.call<void>(kSetStatus, chooser, jstr("too early"));  // "hwnd" still 0

    HWND owner = nullptr;
    bool okAfterSelection = false;
    jstring result = showWhileDriving([&] { return lib.call<jstring>(kBrowse, chooser); },
                                      [&] {
                                          HWND shown = waitForDialog([&] { return handleOf(vm, chooser); });
                                          ASSERT_NE(shown, nullptr);
                                          owner = GetWindow(shown, GW_OWNER);
                                          EXPECT_TRUE(select(shown, path("good")));
                                          okAfterSelection = okEnabled(shown);
                                          press(shown, IDOK);
                                      });
    ASSERT_NE(result, nullptr);
    EXPECT_EQ(vm.stringUtf8(result), path("good"));
    EXPECT_EQ(owner, hidden);
    ASSERT_EQ(spy.browses.size(), 1u);
    EXPECT_EQ(spy.browses[0].owner, hidden);
    EXPECT_TRUE(okAfterSelection);
    EXPECT_TRUE(sentMessages(BFFM_ENABLEOK).empty()) << "no validator, no ENABLEOK";

    // "hwnd" still names the closed dialog; then a window of another process.
    lib.call<void>(kSetStatus, chooser, jstr("too late"));
    HWND desktop = GetDesktopWindow();
    DWORD desktopProcess = 0;
    GetWindowThreadProcessId(desktop, &desktopProcess);
    if (desktopProcess != GetCurrentProcessId()) {
        vm.setLongField(chooser, "hwnd", static_cast<int32_t>(reinterpret_cast<intptr_t>(desktop)));
        lib.call<void>(kSetStatus, chooser, jstr("not ours"));
    }
    EXPECT_TRUE(sentMessages(BFFM_SETSTATUSTEXTA).empty());
    DestroyWindow(hidden);
}

TEST_F(FolderBrowser, AThrowingValidatorIsAskedOnceAndItsExceptionReachesJava) {
    int calls = 0;
    jobject chooser = vm.newInstance(jnihost::kDirectoryChooserClass);
    vm.setObjectField(chooser, "startpath", jstr(path("start")));
    vm.setObjectField(chooser, "validator", vm.newValidator([&](JNIEnv* validatorEnv, const std::string&) {
        ++calls;
        validatorEnv->ThrowNew(validatorEnv->FindClass("java/lang/RuntimeException"), "no folders today");
        return true;
    }));
    jstring result = showWhileDriving([&] { return lib.call<jstring>(kBrowse, chooser); },
                                      [&] {
                                          HWND shown = waitForDialog([&] { return handleOf(vm, chooser); });
                                          ASSERT_NE(shown, nullptr);
                                          EXPECT_TRUE(select(shown, path("good")));  // the dialog goes on
                                          press(shown, IDOK);
                                      });
    EXPECT_EQ(result, nullptr);
    EXPECT_EQ(takeException(), "java/lang/RuntimeException");
    EXPECT_EQ(calls, 1);
    ASSERT_EQ(sentMessages(BFFM_ENABLEOK).size(), 1u) << "only for the selection that threw";
    EXPECT_EQ(sentMessages(BFFM_ENABLEOK)[0].lParam, 0);
}

}  // namespace
