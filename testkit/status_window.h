// A top-level window of the test's own, for nativeSetStatus and nativeActivateWindow without
// a dialog: it keeps the status texts (BFFM_SETSTATUSTEXTA) that it is sent, as bytes. Made
// and used on one thread; a SendMessage from that thread reaches it without a message loop.
#pragma once

#include <windows.h>

#include <string>
#include <vector>

namespace testkit {

class StatusWindow {
public:
    StatusWindow();
    ~StatusWindow();
    StatusWindow(const StatusWindow&) = delete;
    StatusWindow& operator=(const StatusWindow&) = delete;

    HWND handle() const { return window_; }
    // The texts received since the last clear, oldest first.
    const std::vector<std::string>& received() const { return received_; }
    void clear() { received_.clear(); }

    // The value a destroyed window of this kind had: a stale handle.
    static HWND staleHandle();

private:
    static LRESULT CALLBACK proc(HWND window, UINT message, WPARAM wParam, LPARAM lParam);

    HWND window_ = nullptr;
    std::vector<std::string> received_;
};

}  // namespace testkit
