// Driving a real modal dialog from a test as a person would. A modal dialog blocks the
// thread that shows it until it closes, so the test shows it on its own thread while a
// second thread finds it, looks at it and presses its buttons. Every wait has a timeout,
// and a dialog still open when the driving steps end is cancelled, so a test whose
// checks fail still ends instead of hanging on an open dialog.
//
// Only user32 is used (the file-dialog and tree-view names are message constants), so
// every test program can link it.
#pragma once

#include <windows.h>

#include <atomic>
#include <functional>
#include <string>
#include <thread>

namespace testkit {

constexpr DWORD kDialogTimeoutMs = 15000;

// A visible standard dialog window (class #32770).
bool isDialog(HWND window);

// The visible dialog among the thread's windows, or null.
HWND dialogOfThread(DWORD thread);

// Asks `find` every 20 ms until it names a visible dialog, then gives the dialog a moment to
// paint and returns it; null after kDialogTimeoutMs.
HWND waitForDialog(const std::function<HWND()>& find);

// Clicks a button (IDOK, IDCANCEL, ...) of the dialog.
void press(HWND dialog, int button);

// Types a name into the file name box of an open or save dialog and presses OK.
void typeFileNameAndPressOk(HWND dialog, const char* typed);

// True when one of the dialog's controls shows exactly this text.
bool showsText(HWND dialog, const std::string& text);

// A plain top-level popup window of this process (visible or hidden), for tests about
// owner windows and raising.
HWND createTopLevel(bool visible, int x = 0, int y = 0, int width = 200, int height = 100);

// The shell folder browser's tree: the selected item's text, the state of OK, and a click
// on a folder given by its path ("C:\\a\\b": My Computer, then "(C:)", "a", "b", each opened
// on the way). Clicking is used rather than BFFM_SETSELECTION because Wine matches a path
// against its tree by comparing item ID lists byte for byte and now and then leaves a
// folder that is plainly there unselected. True when the folder ends up selected.
std::string treeSelection(HWND dialog);
bool okEnabled(HWND dialog);
bool selectFolder(HWND dialog, const std::string& path);

// Runs `show` (which shows a modal dialog and returns its result) on this thread while a
// second thread waits for the dialog through `find` and runs `steps` on it; `steps` gets
// null when no dialog appeared in time. Returns what `show` returned.
template <class Show>
auto showWhileDriving(Show show, std::function<HWND()> find, std::function<void(HWND)> steps) {
    const DWORD dialogThread = GetCurrentThreadId();
    std::atomic<bool> returned{false};
    std::thread driver([&] {
        steps(waitForDialog(find));
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

}  // namespace testkit
