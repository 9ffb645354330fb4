// The choosers: a tour cannot wait for a person, so a helper thread plays the user. It
// waits for each dialog's handle in "hwnd", says where the dialog stands, and after a
// moment answers it.
#include <windows.h>
#include <objbase.h>
#include <shlobj.h>

#include <atomic>
#include <cstdio>
#include <cstring>
#include <functional>
#include <thread>

#include "tour.h"

namespace {

const char kFilePrefix[] = "_Java_com_velmor_coreutil_hack_HackWindowsFileChooser_";
const char kFolderPrefix[] = "_Java_com_velmor_coreutil_hack_HackWindowsDirectoryChooser_";

HWND shownDialog(jnihost::Vm& vm, jobject chooser) {
    auto* dialog =
        reinterpret_cast<HWND>(static_cast<uintptr_t>(static_cast<uint32_t>(vm.longField(chooser, "hwnd"))));
    return dialog != nullptr && IsWindowVisible(dialog) ? dialog : nullptr;
}

BOOL CALLBACK cancelDialog(HWND window, LPARAM) {
    char name[16] = {};
    GetClassNameA(window, name, sizeof name);
    if (std::strcmp(name, "#32770") == 0) {
        PostMessageA(window, WM_COMMAND, IDCANCEL, 0);
    }
    return TRUE;
}

// Runs the dialog on this thread and `answer` on a helper once the dialog is shown; a
// dialog that never reports its handle is cancelled, so the tour always goes on.
template <class Show>
auto withHelper(jnihost::Vm& vm, jobject chooser, Show show, std::function<void(HWND)> answer) {
    const DWORD dialogThread = GetCurrentThreadId();
    std::atomic<bool> returned{false};
    std::thread helper([&] {
        for (int waited = 0; waited < 15000 && !returned; waited += 50) {
            if (HWND dialog = shownDialog(vm, chooser)) {
                RECT frame{};
                GetWindowRect(dialog, &frame);
                std::printf("  the dialog is shown at (%ld, %ld), %ld x %ld\n", frame.left, frame.top,
                            frame.right - frame.left, frame.bottom - frame.top);
                Sleep(700);
                answer(dialog);
                break;
            }
            Sleep(50);
        }
        while (!returned) {
            EnumThreadWindows(dialogThread, cancelDialog, 0);
            Sleep(200);
        }
    });
    auto result = show();
    returned = true;
    helper.join();
    return result;
}

}  // namespace

void tourChoosers(jnihost::Vm& vm, jnihost::Library& lib) {
    auto name = [](const char* prefix, const char* method) { return std::string(prefix) + method; };
    std::printf("\nHackWindowsDirectoryChooser, HackWindowsFileChooser\n");
    CoInitialize(nullptr);  // the folder browser needs COM on its thread

    jobject folders = vm.newInstance(jnihost::kDirectoryChooserClass);
    vm.setLongField(folders, "centerx", 640);
    vm.setLongField(folders, "centery", 512);
    vm.setObjectField(folders, "title", vm.newStringUtf8("Where shall the tour look?"));
    vm.setLongField(folders, "browseFlags", BIF_STATUSTEXT);
    vm.setObjectField(folders, "startpath", vm.newStringUtf8("C:\\windows"));
    vm.setObjectField(folders, "validator", vm.newValidator([](JNIEnv*, const std::string& path) {
        std::printf("  validateDirectory(\"%s\") -> true\n", path.c_str());
        return true;
    }));
    std::printf("  nativeBrowseForFolder() centred on (640, 512), starting in C:\\windows\n");
    jstring folder = withHelper(
        vm, folders,
        [&] { return lib.call<jstring>(name(kFolderPrefix, "nativeBrowseForFolder@8").c_str(), folders); },
        [&](HWND dialog) {
            lib.call<void>(name(kFolderPrefix, "nativeSetStatus@12").c_str(), folders,
                           vm.newStringUtf8("The tour presses OK now"));
            std::printf("  nativeSetStatus from the helper thread; the helper presses OK\n");
            PostMessageA(dialog, WM_COMMAND, IDOK, 0);
        });
    std::printf("  -> %s\n", folder ? ("\"" + vm.stringUtf8(folder) + "\"").c_str() : "null");

    jobject files = vm.newInstance(jnihost::kFileChooserClass);
    vm.setLongField(files, "centerx", 400);
    vm.setLongField(files, "centery", 300);
    jobjectArray filters = vm.newStringArray({vm.newStringUtf8("Text files"), vm.newStringUtf8("*.txt"),
                                              vm.newStringUtf8("All files"), vm.newStringUtf8("*.*")});
    std::printf(
        "  nativeBrowseForFile(Text files / All files, title \"Open for the tour\") centred on (400, 300)\n");
    jobject chosen = withHelper(
        vm, files,
        [&] {
            return lib.call<jobject>(name(kFilePrefix, "nativeBrowseForFile@28").c_str(), files, filters,
                                     jint{1}, vm.newStringUtf8("C:\\windows"),
                                     vm.newStringUtf8("Open for the tour"), jboolean{JNI_TRUE});
        },
        [&](HWND dialog) {
            lib.call<void>(name(kFilePrefix, "nativeActivateWindow@16").c_str(), jclass{},
                           vm.longField(files, "hwnd"));
            std::printf("  nativeActivateWindow(hwnd) from the helper thread; the helper presses Cancel\n");
            PostMessageA(dialog, WM_COMMAND, IDCANCEL, 0);
        });
    std::printf("  -> %s\n", chosen ? "an array" : "null (cancelled)");
    CoUninitialize();
}
