// What libTessel_JNI hands to Windows when it shows a chooser, recorded through its import
// table (api_spy.h): the OPENFILENAMEA and BROWSEINFOA it fills, the messages it sends to a
// dialog, with the OK button's state right after each BFFM_ENABLEOK, and the windows it
// raises and brings to the foreground. The dialogs' own checks can hide what the library asked for (Wine's
// folder browser, for one, re-enables OK for any folder after the library's callback), so the tests look at
// both.
//
// Header-only: the spies call comdlg32 and shell32, which only the chooser tests link.
#pragma once

#include <windows.h>
#include <commdlg.h>
#include <shlobj.h>

#include <mutex>
#include <string>
#include <vector>

#include "api_spy.h"

namespace testkit::chooser_spy {

struct FileDialogCall {
    DWORD structSize, flags, filterIndex, maxFile;
    HWND owner;
    std::string filter;  // up to its closing double NUL; "<null>" for none
    std::string initialDir, title;
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
    std::string text;     // for BFFM_SETSTATUSTEXTA and BFFM_SETSELECTIONA
    bool okEnabledAfter;  // for BFFM_ENABLEOK
};

struct Log {
    std::mutex mu;
    std::vector<FileDialogCall> fileDialogs;
    std::vector<BrowseCall> browses;
    std::vector<SentMessage> sent;
    std::vector<HWND> raised;      // SetWindowPos targets
    std::vector<HWND> foreground;  // SetForegroundWindow targets
};
inline Log recorded;

inline std::string textOf(const char* text) {
    return text ? text : "<null>";
}

inline void recordFileDialog(const OPENFILENAMEA* dialog) {
    FileDialogCall call{dialog->lStructSize,
                        dialog->Flags,
                        dialog->nFilterIndex,
                        dialog->nMaxFile,
                        dialog->hwndOwner,
                        "<null>",
                        textOf(dialog->lpstrInitialDir),
                        textOf(dialog->lpstrTitle)};
    if (const char* p = dialog->lpstrFilter) {
        while (p[0] != '\0' || p[1] != '\0') {
            ++p;
        }
        call.filter.assign(dialog->lpstrFilter, p + 2);
    }
    std::lock_guard<std::mutex> lock(recorded.mu);
    recorded.fileDialogs.push_back(call);
}

inline BOOL WINAPI getOpenFileName(LPOPENFILENAMEA dialog) {
    recordFileDialog(dialog);
    return GetOpenFileNameA(dialog);
}
inline BOOL WINAPI getSaveFileName(LPOPENFILENAMEA dialog) {
    recordFileDialog(dialog);
    return GetSaveFileNameA(dialog);
}
inline PIDLIST_ABSOLUTE WINAPI browseForFolder(LPBROWSEINFOA browse) {
    {
        std::lock_guard<std::mutex> lock(recorded.mu);
        recorded.browses.push_back({browse->hwndOwner, browse->ulFlags, textOf(browse->lpszTitle)});
    }
    return SHBrowseForFolderA(browse);
}
inline LRESULT WINAPI sendMessage(HWND window, UINT message, WPARAM wParam, LPARAM lParam) {
    {
        // Recorded before sending: a selection sent here comes back as ENABLEOK on this thread.
        std::lock_guard<std::mutex> lock(recorded.mu);
        const bool carriesText = message == BFFM_SETSTATUSTEXTA || message == BFFM_SETSELECTIONA;
        recorded.sent.push_back({window, message, wParam, lParam,
                                 carriesText ? textOf(reinterpret_cast<const char*>(lParam)) : std::string(),
                                 false});
    }
    const LRESULT result = SendMessageA(window, message, wParam, lParam);
    if (message == BFFM_ENABLEOK) {
        // What the message did to the button, seen before the dialog goes on.
        const bool enabled = IsWindowEnabled(GetDlgItem(window, IDOK)) != FALSE;
        std::lock_guard<std::mutex> lock(recorded.mu);
        for (auto m = recorded.sent.rbegin(); m != recorded.sent.rend(); ++m) {
            if (m->message == BFFM_ENABLEOK && m->window == window) {
                m->okEnabledAfter = enabled;
                break;
            }
        }
    }
    return result;
}
inline BOOL WINAPI setWindowPos(HWND window, HWND after, int x, int y, int cx, int cy, UINT flags) {
    {
        std::lock_guard<std::mutex> lock(recorded.mu);
        recorded.raised.push_back(window);
    }
    return SetWindowPos(window, after, x, y, cx, cy, flags);
}
inline BOOL WINAPI setForegroundWindow(HWND window) {
    {
        std::lock_guard<std::mutex> lock(recorded.mu);
        recorded.foreground.push_back(window);
    }
    return SetForegroundWindow(window);
}

// Empties the log and points the library's imports at the spies; false when one of the
// six imports is missing.
inline bool install(HMODULE library) {
    {
        std::lock_guard<std::mutex> lock(recorded.mu);
        recorded.fileDialogs.clear();
        recorded.browses.clear();
        recorded.sent.clear();
        recorded.raised.clear();
        recorded.foreground.clear();
    }
    return patchImport(library, "GetOpenFileNameA", reinterpret_cast<void*>(getOpenFileName)) &&
           patchImport(library, "GetSaveFileNameA", reinterpret_cast<void*>(getSaveFileName)) &&
           patchImport(library, "SHBrowseForFolderA", reinterpret_cast<void*>(browseForFolder)) &&
           patchImport(library, "SendMessageA", reinterpret_cast<void*>(sendMessage)) &&
           patchImport(library, "SetWindowPos", reinterpret_cast<void*>(setWindowPos)) &&
           patchImport(library, "SetForegroundWindow", reinterpret_cast<void*>(setForegroundWindow));
}

// Copies of the log, taken under its lock.
inline std::vector<FileDialogCall> fileDialogs() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    return recorded.fileDialogs;
}
inline std::vector<BrowseCall> browses() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    return recorded.browses;
}
inline std::vector<HWND> raised() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    return recorded.raised;
}
inline std::vector<HWND> foregrounded() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    return recorded.foreground;
}
// The messages of one kind the library sent, in order.
inline std::vector<SentMessage> sent(UINT message) {
    std::lock_guard<std::mutex> lock(recorded.mu);
    std::vector<SentMessage> found;
    for (const SentMessage& m : recorded.sent) {
        if (m.message == message) {
            found.push_back(m);
        }
    }
    return found;
}

}  // namespace testkit::chooser_spy
