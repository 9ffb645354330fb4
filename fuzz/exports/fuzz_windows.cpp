// nativeSetStatus and nativeActivateWindow under fuzz, without any dialog: handles of a live
// window of the driver's own (which records the status texts it is sent), of a destroyed one,
// of other processes' windows, and odd values, with noise in the high half of the Java long.
#include <windows.h>

#include "chooser_client.h"
#include "fuzz_case.h"
#include "fuzz_run.h"

namespace fuzz {

namespace {

// The second process: a window that counts the status texts it gets in memory shared with
// the driver, which must see none arrive. Its handle and the count: shared[0] and shared[1].
volatile LONG* foreignShared = nullptr;

LRESULT CALLBACK foreignProc(HWND window, UINT message, WPARAM wParam, LPARAM lParam) {
    if (message == WM_USER + 100 && foreignShared != nullptr) {  // BFFM_SETSTATUSTEXTA
        InterlockedIncrement(&foreignShared[1]);
        return 0;
    }
    return DefWindowProcA(window, message, wParam, lParam);
}

std::string mappingName(DWORD driverProcess) {
    return "TesselFuzzForeignWindow-" + std::to_string(driverProcess);
}

// Starts the second process and waits until its window exists; null when it cannot.
HWND startForeignWindow(WindowTargets* t) {
    const std::string name = mappingName(GetCurrentProcessId());
    HANDLE mapping = CreateFileMappingA(INVALID_HANDLE_VALUE, nullptr, PAGE_READWRITE, 0, 4096, name.c_str());
    auto* shared = static_cast<volatile LONG*>(MapViewOfFile(mapping, FILE_MAP_WRITE, 0, 0, 0));
    char self[MAX_PATH];
    GetModuleFileNameA(nullptr, self, MAX_PATH);
    std::string command =
        std::string("\"") + self + "\" --foreign-window " + std::to_string(GetCurrentProcessId());
    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION child{};
    if (shared == nullptr || !CreateProcessA(nullptr, &command[0], nullptr, nullptr, FALSE, 0, nullptr,
                                             nullptr, &startup, &child)) {
        return nullptr;
    }
    CloseHandle(child.hThread);
    t->foreignProcess = child.hProcess;
    t->foreignReceived = &shared[1];
    for (int waited = 0; shared[0] == 0 && waited < 30000; waited += 20) {
        Sleep(20);
    }
    return reinterpret_cast<HWND>(static_cast<intptr_t>(shared[0]));
}

BOOL CALLBACK collectForeign(HWND window, LPARAM parameter) {
    DWORD owner = 0;
    GetWindowThreadProcessId(window, &owner);
    auto* list = reinterpret_cast<std::vector<HWND>*>(parameter);
    if (owner != GetCurrentProcessId() && list->size() < 8) {
        list->push_back(window);
    }
    return TRUE;
}

// A window handle as Java holds it: the 32-bit value sign-extended, with noise in the high
// half now and then (only the low 32 bits name the window).
jlong javaHandle(Case& c, HWND window) {
    const auto low = static_cast<int32_t>(reinterpret_cast<intptr_t>(window));
    const jlong high = c.rng.chance(25) ? static_cast<jlong>(c.rng.next() << 32) : 0;
    return c.rng.chance(25) ? static_cast<jlong>(static_cast<uint32_t>(low)) | high : static_cast<jlong>(low);
}

// A target: the live window, a stale, foreign or odd handle, or any value.
jlong anyTarget(Case& c, const WindowTargets& t) {
    switch (c.rng.below(8)) {
        case 0:
        case 1:
            return javaHandle(c, t.live->handle());
        case 2:
            return javaHandle(c, t.stale);
        case 3:
            return t.foreign.empty() ? 0 : javaHandle(c, c.rng.pick(t.foreign));
        case 4:
            return c.rng.chance(50) ? 0 : jlong{1} << 32;
        case 5: {
            static const jlong odd[] = {-1, 0xFFFF, 1, 4, -3, 0x7FFFFFFF, static_cast<jlong>(0x80000000u)};
            return odd[c.rng.below(7)];
        }
        default:
            return static_cast<jlong>(c.rng.next());
    }
}

bool low32Is(jlong value, HWND window) {
    return static_cast<uint32_t>(value) == static_cast<uint32_t>(reinterpret_cast<uintptr_t>(window));
}

void opSetStatus(Case& c, WindowTargets& t) {
    const jlong target = anyTarget(c, t);
    jobject chooser = c.vm.newInstance(jnihost::kDirectoryChooserClass);
    c.vm.setLongField(chooser, "hwnd", target);
    const bool null = c.rng.chance(10);
    const std::u16string text = null ? u"" : anyText(c.rng);
    t.live->clear();
    const LONG foreignBefore = t.foreignReceived ? *t.foreignReceived : 0;
    c.callOn<void>(testkit::chooser::kSetStatus, chooser, null ? jstring{} : c.vm.newString(text));
    const LONG foreignGot = (t.foreignReceived ? *t.foreignReceived : 0) - foreignBefore;
    c.expect(foreignGot == 0, [&] {
        return "nativeSetStatus(hwnd " + std::to_string(target) + ") sent " + std::to_string(foreignGot) +
               " status texts to a window of another process";
    });
    const bool wantText = !null && low32Is(target, t.live->handle());
    const std::vector<std::string>& received = t.live->received();
    const std::string want = cutAtNul(ansiBytes(text));
    c.expect(wantText ? received.size() == 1 && received[0] == want : received.empty(), [&] {
        return "nativeSetStatus(hwnd " + std::to_string(target) + ", " +
               (null ? std::string("null") : show(text)) + ") delivered " + std::to_string(received.size()) +
               " texts to the driver's window, expected " + (wantText ? "the text" : "none");
    });
}

void opActivate(Case& c, WindowTargets& t) {
    const jlong target = anyTarget(c, t);
    RECT before{}, after{};
    const HWND own = t.live->handle();
    GetWindowRect(own, &before);
    c.call<void>(testkit::chooser::kActivate, target);
    GetWindowRect(own, &after);
    c.expect(IsWindow(own) && EqualRect(&before, &after), [&] {
        return "nativeActivateWindow(" + std::to_string(target) + ") moved or resized the driver's window";
    });
}

}  // namespace

void makeWindowTargets(WindowTargets* t) {
    t->live = std::make_unique<testkit::StatusWindow>();
    t->stale = testkit::StatusWindow::staleHandle();
    EnumWindows(collectForeign, reinterpret_cast<LPARAM>(&t->foreign));
    t->foreign.push_back(GetDesktopWindow());
    if (HWND other = startForeignWindow(t)) {
        t->foreign.push_back(other);
        t->foreign.push_back(other);  // drawn twice as often: it is the one that can tell
    }
}

void destroyWindowTargets(WindowTargets* t) {
    t->live.reset();
    if (t->foreignProcess != nullptr) {
        TerminateProcess(t->foreignProcess, 0);
        CloseHandle(t->foreignProcess);
    }
}

int foreignWindowMain(unsigned long driverProcess) {
    HANDLE mapping = OpenFileMappingA(FILE_MAP_WRITE, FALSE, mappingName(driverProcess).c_str());
    HANDLE driver = OpenProcess(SYNCHRONIZE, FALSE, driverProcess);
    foreignShared =
        mapping ? static_cast<volatile LONG*>(MapViewOfFile(mapping, FILE_MAP_WRITE, 0, 0, 0)) : nullptr;
    if (foreignShared == nullptr || driver == nullptr) {
        return 1;
    }
    WNDCLASSA cls{};
    cls.lpfnWndProc = foreignProc;
    cls.hInstance = GetModuleHandleA(nullptr);
    cls.lpszClassName = "TesselFuzzForeignWindow";
    RegisterClassA(&cls);
    HWND window = CreateWindowExA(0, cls.lpszClassName, "another process", WS_OVERLAPPEDWINDOW, 60, 60, 200,
                                  100, nullptr, nullptr, cls.hInstance, nullptr);
    InterlockedExchange(&foreignShared[0], static_cast<LONG>(reinterpret_cast<intptr_t>(window)));
    // Serves sent messages until the driver ends.
    while (MsgWaitForMultipleObjects(1, &driver, FALSE, INFINITE, QS_ALLINPUT) != WAIT_OBJECT_0) {
        MSG msg;
        while (PeekMessageA(&msg, nullptr, 0, 0, PM_REMOVE)) {
            DispatchMessageA(&msg);
        }
    }
    return 0;
}

void fuzzWindows(Case& c, Run& run) {
    c.family = "windows";
    const int steps = static_cast<int>(c.rng.range(1, 20));
    for (int i = 0; i < steps && c.failures.empty(); ++i) {
        if (c.rng.chance(60)) {
            opSetStatus(c, run.windows);
        } else {
            opActivate(c, run.windows);
        }
    }
}

}  // namespace fuzz
