// The status-recording window of status_window.h.
#include "status_window.h"

namespace testkit {

namespace {

constexpr UINT kSetStatusText = WM_USER + 100;  // BFFM_SETSTATUSTEXTA
const char kClass[] = "TesselStatusWindow";

// The class is registered once per process and stays.
void registerClass(WNDPROC proc) {
    static const bool registered = [proc] {
        WNDCLASSA cls{};
        cls.lpfnWndProc = proc;
        cls.hInstance = GetModuleHandleA(nullptr);
        cls.lpszClassName = kClass;
        return RegisterClassA(&cls) != 0;
    }();
    (void)registered;
}

HWND create(WNDPROC proc, void* self) {
    registerClass(proc);
    return CreateWindowExA(0, kClass, "status window", WS_OVERLAPPEDWINDOW, 40, 40, 300, 200, nullptr,
                           nullptr, GetModuleHandleA(nullptr), self);
}

}  // namespace

StatusWindow::StatusWindow() {
    window_ = create(proc, this);
    ShowWindow(window_, SW_SHOWNOACTIVATE);
}

StatusWindow::~StatusWindow() {
    DestroyWindow(window_);
}

HWND StatusWindow::staleHandle() {
    HWND window = create(proc, nullptr);
    DestroyWindow(window);
    return window;
}

LRESULT CALLBACK StatusWindow::proc(HWND window, UINT message, WPARAM wParam, LPARAM lParam) {
    if (message == WM_NCCREATE) {
        const auto* create = reinterpret_cast<const CREATESTRUCTA*>(lParam);
        SetWindowLongPtrA(window, GWLP_USERDATA, reinterpret_cast<LONG_PTR>(create->lpCreateParams));
    }
    auto* self = reinterpret_cast<StatusWindow*>(GetWindowLongPtrA(window, GWLP_USERDATA));
    if (message == kSetStatusText && self != nullptr) {
        self->received_.emplace_back(lParam ? reinterpret_cast<const char*>(lParam) : "");
        return 0;
    }
    return DefWindowProcA(window, message, wParam, lParam);
}

}  // namespace testkit
