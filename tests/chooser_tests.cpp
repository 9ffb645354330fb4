// Choosers: the open/save dialogs and the folder browser shown for real under Wine and
// driven from a second thread as a person would (testkit/dialog_driver.h), with what the
// library hands to Windows seen through its import table (testkit/chooser_spy.h), plus the
// helpers linked in directly.
#include <windows.h>
#include <malloc.h>
#include <objbase.h>
#include <shlobj.h>

#include <algorithm>
#include <cstdio>
#include <functional>
#include <mutex>
#include <string>
#include <tuple>
#include <vector>

#include "bridge/text_conversion.h"
#include "choosers/chooser_window.h"
#include "choosers/file_dialogs.h"
#include "c_drive_folder.h"
#include "chooser_client.h"
#include "chooser_spy.h"
#include "dialog_driver.h"
#include "heap_spy.h"
#include "host_fixture.h"
#include "screenshot.h"

namespace {

using namespace testkit;
using namespace testkit::chooser;
namespace spy = testkit::chooser_spy;
using Paths = std::vector<std::string>;

// The open/save dialogs' structure in its old version, the same fields on both: 76 bytes on
// x86, 136 on x64.
constexpr DWORD kOldStructSize = sizeof(void*) == 8 ? 136 : 76;

// Centred on the point by integer halves of its size, never at a negative coordinate.
void expectCentredOn(HWND dialog, int cx, int cy) {
    RECT frame{};
    ASSERT_TRUE(GetWindowRect(dialog, &frame));
    EXPECT_EQ(frame.left, std::max(0L, cx - (frame.right - frame.left) / 2)) << "centre " << cx;
    EXPECT_EQ(frame.top, std::max(0L, cy - (frame.bottom - frame.top) / 2)) << "centre " << cy;
}

// Dialogs on the real (Wine) desktop, with the library's imports spied on and a scratch
// folder holding start, blocked, good, a.txt and b.txt.
class ChooserTest : public HostTest {
protected:
    void SetUp() override {
        CoInitialize(nullptr);  // the folder browser's thread must have COM
        ASSERT_TRUE(spy::install(static_cast<HMODULE>(lib.handle())));
        ASSERT_TRUE(heap_spy::install(static_cast<HMODULE>(lib.handle())));
        heap_spy::reset();  // counts this thread, the one that shows the dialogs
    }
    void TearDown() override {
        CoUninitialize();
        EXPECT_EQ(heap_spy::liveBlocks(), 0u) << "heap blocks the library did not give back";
    }

    std::string path(const char* name) const { return scratch.child(name); }
    jstring jstr(const std::string& text) { return vm.newStringUtf8(text); }
    // Finds the chooser's dialog through the handle the library wrote into "hwnd".
    std::function<HWND()> byHandle(jobject chooser) {
        return [this, chooser] { return dialogOf(vm, chooser); };
    }
    jobject fileDialog(const char* exportName, jobject chooser, jobjectArray filters, bool multiple) {
        return lib.call<jobject>(exportName, chooser, filters, jint{2}, jstr(scratch.path()),
                                 jstr("Pick files"), jboolean(multiple ? JNI_TRUE : JNI_FALSE));
    }
    jobject directoryChooser(const std::string& startPath, jnihost::ValidatorFn validator = nullptr) {
        jobject chooser = vm.newInstance(jnihost::kDirectoryChooserClass);
        vm.setObjectField(chooser, "startpath", jstr(startPath));
        if (validator) {
            vm.setObjectField(chooser, "validator", vm.newValidator(validator));
        }
        return chooser;
    }

    CDriveFolder scratch{"tessel-choosers", {"start", "blocked", "good"}, {"a.txt", "b.txt"}};
};

// ---- Helpers, without a dialog ----

using Helpers = HostTest;

TEST_F(Helpers, FilterListHoldsEachTextWithItsNulAndFourMoreNuls) {
    // The whole calloc block, or "<none>" for no list.
    auto build = [&](jobjectArray filters) {
        bool failed = true;
        HeapBlock<char> list(buildFilterList(env(), filters, &failed));
        EXPECT_FALSE(failed);
        return list ? std::string(list.get(), _msize(list.get())) : std::string("<none>");
    };
    EXPECT_EQ(build(stringArray(vm, {"Text files", "*.txt", "All files", "*.*"})),
              std::string("Text files\0*.txt\0All files\0*.*\0\0\0\0\0", 35));
    EXPECT_EQ(build(stringArray(vm, {nullptr, "A", nullptr, "*.a"})), std::string("A\0*.a\0\0\0\0\0\0\0", 12))
        << "a null element adds neither text nor NUL";
    EXPECT_EQ(build(stringArray(vm, {"", "*.a"})), std::string("\0*.a\0\0\0\0\0", 9))
        << "an empty text is kept; Windows reads its lone NUL as the end";
    for (jobjectArray none :
         {static_cast<jobjectArray>(nullptr), stringArray(vm, {}), stringArray(vm, {nullptr, "", nullptr})}) {
        EXPECT_EQ(build(none), "<none>");
    }
}

TEST_F(Helpers, SelectionJoinsFolderAndNamesAtTheirRealLength) {
    auto convert = [&](const std::string& written) {
        std::string buffer = written + std::string(16, '\0');
        OPENFILENAMEA dialog{};
        dialog.lpstrFile = &buffer[0];
        dialog.nMaxFile = static_cast<DWORD>(buffer.size());
        jobjectArray paths = selectionToJava(env(), dialog);
        EXPECT_NE(paths, nullptr);
        return strings(vm, paths);
    };
    EXPECT_EQ(convert("C:\\dir\\one.txt"), Paths{"C:\\dir\\one.txt"});
    EXPECT_EQ(convert(std::string("C:\\\0a.txt\0b.txt\0", 16)), (Paths{"C:\\\\a.txt", "C:\\\\b.txt"}))
        << "a drive root keeps its backslash";
    EXPECT_EQ(convert(""), Paths{});
    // 200 + 1 + 100 bytes: longer than MAX_PATH, and still whole.
    const std::string longFolder = "C:\\" + std::string(197, 'd');
    const std::string longName = std::string(96, 'n') + ".txt";
    EXPECT_EQ(convert(longFolder + '\0' + longName + '\0' + "x" + '\0'),
              (Paths{longFolder + "\\" + longName, longFolder + "\\x"}));
}

// Java holds points and window handles in longs, of which only the low 32 bits count.
using Placement = ChooserTest;

TEST_F(Placement, CentringAndActivateWindowUseTheLow32BitsAndHandlesAreStoredSignExtended) {
    HWND first = createTopLevel(true, 10, 10, 400, 301);
    HWND second = createTopLevel(true, 50, 50);
    ASSERT_TRUE(first != nullptr && second != nullptr);
    SetForegroundWindow(second);
    lib.call<void>(kActivate, jclass{}, jlong{0});
    lib.call<void>(kActivate, jclass{}, jlong{1} << 32);
    EXPECT_TRUE(spy::raised().empty()) << "0 and 2^32 name no window";
    EXPECT_EQ(GetForegroundWindow(), second);
    const auto low = static_cast<uint32_t>(reinterpret_cast<uintptr_t>(first));
    lib.call<void>(kActivate, jclass{}, static_cast<jlong>((uint64_t{0xdeadbeef} << 32) | low));
    EXPECT_EQ(spy::raised(), std::vector<HWND>{first});
    // Wine's SetWindowPos already brings a window of ours forward; the library asks as well.
    EXPECT_EQ(spy::foregrounded(), std::vector<HWND>{first});
    EXPECT_EQ(GetForegroundWindow(), first);
    // A handle with bit 31 set reaches USER32 sign-extended, as 64-bit Windows hands such
    // handles out, whether Java holds it sign-extended or not. Wine looks only at the low 32
    // bits, so only the spy sees the difference.
    const auto highBit = reinterpret_cast<HWND>(static_cast<LONG_PTR>(static_cast<LONG>(0x80001234)));
    lib.call<void>(kActivate, jclass{}, jlong{0x80001234});
    lib.call<void>(kActivate, jclass{}, jlong{-0x7fffedcc});
    EXPECT_EQ(spy::raised(), (std::vector<HWND>{first, highBit, highBit}));

    jobject chooser = newChooser(vm, jnihost::kDirectoryChooserClass, 1000 + (int64_t{7} << 32), 500);
    centerWindowAt(env(), chooser, kDirectoryChooserClass, first);
    RECT frame{};
    GetWindowRect(first, &frame);
    EXPECT_EQ(std::vector<LONG>({frame.left, frame.top, frame.right - frame.left}),
              std::vector<LONG>({800, 350, 400}))
        << "(1000, 500) less halves of 400 x 301, size kept";
    vm.setLongField(chooser, "centerx", 100);
    vm.setLongField(chooser, "centery", 150);
    centerWindowAt(env(), chooser, kDirectoryChooserClass, first);
    GetWindowRect(first, &frame);
    EXPECT_EQ(std::make_pair(frame.left, frame.top), std::make_pair(0L, 0L)) << "never off screen";
    storeWindowHandle(env(), chooser, kDirectoryChooserClass, highBit);
    EXPECT_EQ(vm.longField(chooser, "hwnd"), int64_t{-0x7fffedcc});
    DestroyWindow(first);
    DestroyWindow(second);
}

TEST_F(Placement, FileDialogHookActsOnlyOnceTheDialogIsReady) {
    HWND window = createTopLevel(true, 10, 10, 400, 300);
    ASSERT_NE(window, nullptr);
    jobject chooser = newChooser(vm, jnihost::kFileChooserClass, 1000, 500);
    ChooserContext context{env(), chooser, false};
    OPENFILENAMEA dialog{};
    dialog.lCustData = reinterpret_cast<LPARAM>(&context);
    OFNOTIFYA notify{};
    notify.hdr.hwndFrom = window;
    notify.lpOFN = &dialog;
    const auto hook = [&](UINT code) {
        notify.hdr.code = code;
        return fileDialogHook(window, WM_NOTIFY, 0, reinterpret_cast<LPARAM>(&notify));
    };
    for (UINT code : {UINT(CDN_SELCHANGE), UINT(CDN_FOLDERCHANGE), UINT(CDN_TYPECHANGE), UINT(CDN_FILEOK)}) {
        EXPECT_EQ(hook(code), 0u) << code;
    }
    EXPECT_EQ(vm.longField(chooser, "hwnd"), 0) << "nothing stored before CDN_INITDONE";
    EXPECT_EQ(hook(CDN_INITDONE), 0u);
    EXPECT_EQ(vm.longField(chooser, "hwnd"), static_cast<int32_t>(reinterpret_cast<intptr_t>(window)));
    RECT frame{};
    GetWindowRect(window, &frame);
    EXPECT_EQ(std::make_pair(frame.left, frame.top), std::make_pair(800L, 350L));
    DestroyWindow(window);
}

// ---- The file dialogs ----

using FileDialog = ChooserTest;

TEST_F(FileDialog, OpenReturnsTheChosenPathsCentredWithTheFilterAndFlagsGiven) {
    const jobjectArray filters = stringArray(vm, {"Text files", "*.txt", "All files", "*.*"});
    const std::string filterBytes("Text files\0*.txt\0All files\0*.*\0\0", 32);
    struct Case {
        bool multiple;
        jobjectArray filters;
        const char* typed;
        Paths chosen;
        DWORD flags;
    };
    const Case cases[] = {
        {false, filters, "a.txt", {path("a.txt")}, 0x81824},
        {true, filters, "a.txt", {path("a.txt")}, 0x81A24},
        // Two files in one folder, in Windows' order; a null filter array means no filter.
        {true, nullptr, "\"a.txt\" \"b.txt\"", {path("a.txt"), path("b.txt")}, 0x81A24},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.typed + std::string(c.multiple ? ", multiple allowed" : ""));
        jobject chooser = newChooser(vm, jnihost::kFileChooserClass, 640, 400);
        jobject result = showWhileDriving(
            [&] { return fileDialog(kOpen, chooser, c.filters, c.multiple); }, byHandle(chooser),
            [&](HWND shown) {
                ASSERT_NE(shown, nullptr) << "no dialog with its handle in hwnd";
                expectCentredOn(shown, 640, 400);
                if (&c == cases) {
                    saveScreenshot("open-dialog");
                }
                typeFileNameAndPressOk(shown, c.typed);
            });
        EXPECT_EQ(strings(vm, result), c.chosen);
    }
    const std::vector<spy::FileDialogCall> calls = spy::fileDialogs();
    ASSERT_EQ(calls.size(), 3u);
    for (size_t i = 0; i < calls.size(); ++i) {
        EXPECT_EQ(calls[i].flags, cases[i].flags) << i;
        EXPECT_EQ(calls[i].filter, cases[i].filters ? filterBytes : "<null>") << i;
        // Size, owner, filter index, name buffer, start folder and title.
        EXPECT_EQ(std::make_tuple(calls[i].structSize, calls[i].owner, calls[i].filterIndex, calls[i].maxFile,
                                  calls[i].initialDir, calls[i].title),
                  std::make_tuple(kOldStructSize, HWND{}, DWORD{2}, DWORD{10000}, scratch.path(),
                                  std::string("Pick files")));
    }
}

TEST_F(FileDialog, MissingCentreFieldPlacesTheDialogAtTheOriginAndItsErrorReachesJava) {
    vm.failMemberLookup(jnihost::kFileChooserClass, "centerx");
    jobject chooser = newChooser(vm, jnihost::kFileChooserClass, 640, 400);
    const DWORD dialogThread = GetCurrentThreadId();
    jobject result = showWhileDriving([&] { return fileDialog(kOpen, chooser, nullptr, false); },
                                      [&] { return dialogOfThread(dialogThread); },
                                      [&](HWND shown) {
                                          ASSERT_NE(shown, nullptr);
                                          expectCentredOn(shown, 0, 0);
                                          typeFileNameAndPressOk(shown, "a.txt");
                                      });
    EXPECT_EQ(result, nullptr) << "Java sees the pending error instead of a result";
    EXPECT_EQ(takeException(), "java/lang/NoSuchFieldError");
    EXPECT_EQ(vm.longField(chooser, "hwnd"), 0) << "no write while the error is pending";
}

// ---- Cancel, all three dialogs ----

using Cancel = ChooserTest;

TEST_F(Cancel, GivesNullFromAllThreeDialogs) {
    auto cancel = [](const char* screenshot) {
        return [screenshot](HWND shown) {
            ASSERT_NE(shown, nullptr) << screenshot;
            saveScreenshot(screenshot);
            press(shown, IDCANCEL);
        };
    };
    jobject open = newChooser(vm, jnihost::kFileChooserClass, 400, 300);
    EXPECT_EQ(showWhileDriving([&] { return fileDialog(kOpen, open, nullptr, false); }, byHandle(open),
                               cancel("open-dialog-cancel")),
              nullptr);
    jobject save = newChooser(vm, jnihost::kFileChooserClass, 900, 600);
    EXPECT_EQ(showWhileDriving([&] { return fileDialog(kSave, save, stringArray(vm, {}), true); },
                               byHandle(save), cancel("save-dialog")),
              nullptr);
    ASSERT_EQ(spy::fileDialogs().size(), 2u);
    EXPECT_EQ(spy::fileDialogs()[1].flags, 0x81A24u) << "the save dialog gets the same flags";

    jobject directory = vm.newInstance(jnihost::kDirectoryChooserClass);
    EXPECT_EQ(showWhileDriving([&] { return lib.call<jstring>(kBrowse, directory); }, byHandle(directory),
                               cancel("folder-browser-cancel")),
              nullptr);
    EXPECT_EQ(takeException(), "");
}

// ---- The folder browser ----

using FolderBrowser = ChooserTest;

TEST_F(FolderBrowser, ValidatorStatusLineStartPathAndChosenFolder) {
    std::mutex mu;
    Paths asked;
    jobject chooser = directoryChooser(path("start"), [&](JNIEnv*, const std::string& folderPath) {
        std::lock_guard<std::mutex> lock(mu);
        asked.push_back(folderPath);
        return folderPath.find("blocked") == std::string::npos;
    });
    vm.setLongField(chooser, "centerx", 100);  // nearer the left edge than half the width
    vm.setLongField(chooser, "centery", 600);
    vm.setObjectField(chooser, "title", jstr("Pick a folder"));
    vm.setLongField(chooser, "browseFlags", BIF_STATUSTEXT | (int64_t{1} << 40));

    bool statusShown = false;
    jstring result = showWhileDriving([&] { return lib.call<jstring>(kBrowse, chooser); }, byHandle(chooser),
                                      [&](HWND shown) {
                                          ASSERT_NE(shown, nullptr);
                                          expectCentredOn(shown, 100, 600);
                                          if (treeSelection(shown) != "start") {
                                              std::printf("Wine left the start selection undone\n");
                                              selectFolder(shown, path("start"));
                                          }
                                          // From this thread, with its own env.
                                          lib.call<void>(kSetStatus, chooser, static_cast<jstring>(nullptr));
                                          lib.call<void>(kSetStatus, chooser, jstr("Checking the folder"));
                                          statusShown = showsText(shown, "Checking the folder");
                                          selectFolder(shown, path("blocked"));  // the validator says no
                                          selectFolder(shown, path("good"));
                                          saveScreenshot("folder-browser");
                                          press(shown, IDOK);
                                      });
    ASSERT_NE(result, nullptr);
    EXPECT_EQ(vm.stringUtf8(result), path("good"));
    EXPECT_EQ(asked, (Paths{path("start"), path("blocked"), path("good")}));
    // Wine's dialog checks the selection itself once the callback has returned and enables
    // OK for any folder, so the spy reads the button right after each of the library's messages.
    const std::vector<spy::SentMessage> enable = spy::sent(BFFM_ENABLEOK);
    ASSERT_EQ(enable.size(), 3u);
    for (size_t i = 0; i < enable.size(); ++i) {
        const bool valid = i != 1;
        EXPECT_EQ(enable[i].lParam, valid ? 1 : 0) << i;
        EXPECT_EQ(enable[i].okEnabledAfter, valid) << i;
    }
    EXPECT_TRUE(statusShown);
    EXPECT_EQ(spy::sent(BFFM_SETSTATUSTEXTA).size(), 1u) << "a null text sends nothing";
    ASSERT_EQ(spy::sent(BFFM_SETSELECTIONA).size(), 1u);
    EXPECT_EQ(spy::sent(BFFM_SETSELECTIONA)[0].text, path("start"));
    EXPECT_EQ(spy::sent(BFFM_SETSELECTIONA)[0].wParam, WPARAM{TRUE}) << "a path, not an item list";
    ASSERT_EQ(spy::browses().size(), 1u);
    EXPECT_EQ(spy::browses()[0].flags, UINT{BIF_STATUSTEXT}) << "only the low 32 bits of browseFlags";
    EXPECT_EQ(spy::browses()[0].title, "Pick a folder");
}

TEST_F(FolderBrowser, WithoutValidatorOwnedByTheHiddenWindowAndStatusOnlyToALiveDialog) {
    HWND hidden = createTopLevel(false);  // the process's first top-level window, though hidden
    ASSERT_NE(hidden, nullptr);
    jobject chooser = directoryChooser(path("start"));
    lib.call<void>(kSetStatus, chooser, jstr("too early"));  // "hwnd" still 0

    bool okAfterSelection = false;
    jstring result = showWhileDriving([&] { return lib.call<jstring>(kBrowse, chooser); }, byHandle(chooser),
                                      [&](HWND shown) {
                                          ASSERT_NE(shown, nullptr);
                                          EXPECT_TRUE(selectFolder(shown, path("good")));
                                          okAfterSelection = okEnabled(shown);
                                          press(shown, IDOK);
                                      });
    ASSERT_NE(result, nullptr);
    EXPECT_EQ(vm.stringUtf8(result), path("good"));
    ASSERT_EQ(spy::browses().size(), 1u);
    EXPECT_EQ(spy::browses()[0].owner, hidden);
    EXPECT_TRUE(okAfterSelection);
    EXPECT_TRUE(spy::sent(BFFM_ENABLEOK).empty()) << "no validator, no ENABLEOK";

    // "hwnd" still names the closed dialog; then a window of another process.
    lib.call<void>(kSetStatus, chooser, jstr("too late"));
    HWND desktop = GetDesktopWindow();
    DWORD desktopProcess = 0;
    GetWindowThreadProcessId(desktop, &desktopProcess);
    ASSERT_NE(desktopProcess, GetCurrentProcessId()) << "the desktop window should be another process's";
    vm.setLongField(chooser, "hwnd", static_cast<int32_t>(reinterpret_cast<intptr_t>(desktop)));
    lib.call<void>(kSetStatus, chooser, jstr("not ours"));
    EXPECT_TRUE(spy::sent(BFFM_SETSTATUSTEXTA).empty());
    DestroyWindow(hidden);
}

// The start path's text is the first allocation of a dialog without title, the validator's
// Java string of the start folder the second. Either failing leaves the dialog running, and
// the folder then chosen is not handed on.
TEST_F(FolderBrowser, AFailedAllocationInACallbackGivesNullThoughAFolderWasChosen) {
    const size_t startText = path("start").size() + 1;
    struct Case {
        const char* what;
        bool validator;
        int failAt;
        size_t failedSize;
    };
    const Case cases[] = {
        {"start path text", false, 1, startText},
        {"validator's path string", true, 2, startText * sizeof(jchar)},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        Paths asked;
        jnihost::ValidatorFn validator;
        if (c.validator) {
            validator = [&](JNIEnv*, const std::string& folderPath) {
                asked.push_back(folderPath);
                return true;
            };
        }
        jobject chooser = directoryChooser(path("start"), validator);
        heap_spy::failAllocation(c.failAt);
        bool picked = false;
        jstring result =
            showWhileDriving([&] { return lib.call<jstring>(kBrowse, chooser); }, byHandle(chooser),
                             [&](HWND shown) {
                                 ASSERT_NE(shown, nullptr) << "the dialog runs on";
                                 picked = selectFolder(shown, path("good"));
                                 press(shown, IDOK);
                             });
        EXPECT_TRUE(picked);
        EXPECT_EQ(heap_spy::failedSize(), c.failedSize) << "the allocation meant failed";
        EXPECT_EQ(result, nullptr);
        EXPECT_EQ(takeException(), "") << "a failed calloc leaves nothing pending";
        if (c.validator) {
            EXPECT_EQ(asked, Paths{path("good")}) << "asked again at the next selection";
        } else {
            EXPECT_TRUE(spy::sent(BFFM_SETSELECTIONA).empty()) << "no start path to select";
        }
    }
}

// The host hands back the validator's own "true" after its throw, as JNI leaves that value
// undefined; the library must send a defined 0 instead.
TEST_F(FolderBrowser, AThrowingValidatorIsAskedOnceAndItsExceptionReachesJava) {
    int calls = 0;
    jobject chooser = directoryChooser(path("start"), [&](JNIEnv* validatorEnv, const std::string&) {
        ++calls;
        validatorEnv->ThrowNew(validatorEnv->FindClass("java/lang/RuntimeException"), "no folders today");
        return true;
    });
    jstring result =
        showWhileDriving([&] { return lib.call<jstring>(kBrowse, chooser); }, byHandle(chooser),
                         [&](HWND shown) {
                             ASSERT_NE(shown, nullptr);
                             EXPECT_TRUE(selectFolder(shown, path("good")));  // the dialog goes on
                             press(shown, IDOK);
                         });
    EXPECT_EQ(result, nullptr);
    EXPECT_EQ(takeException(), "java/lang/RuntimeException");
    EXPECT_EQ(calls, 1);
    ASSERT_EQ(spy::sent(BFFM_ENABLEOK).size(), 1u) << "only for the selection that threw";
    EXPECT_EQ(spy::sent(BFFM_ENABLEOK)[0].lParam, 0);
}

}  // namespace
