// The soak's measurements: each must see the leak it is there for (a meter that misses one
// would pass every soak), and a JNI host made and dropped must leave nothing behind for them
// to charge to the library.
#include <gtest/gtest.h>
#include <windows.h>

#include <cstdlib>

#include "jnihost.h"
#include "process_meter.h"
#include "status_window.h"

namespace {

using testkit::ProcessSample;
using testkit::sampleProcess;

TEST(ProcessMeter, SeesEachKindOfLeak) {
    // A thread's first window brings Wine's own (its IME window, handles, memory) with it;
    // while one stays, those stay too and the figures below are the leaks' alone.
    testkit::StatusWindow first;
    const ProcessSample before = sampleProcess();
    HANDLE events[3];
    for (HANDLE& e : events) {
        e = CreateEventA(nullptr, TRUE, FALSE, nullptr);
    }
    char* volatile block = static_cast<char*>(std::malloc(5000));  // volatile: not optimised away
    block[0] = 1;
    void* pages = VirtualAlloc(nullptr, 1 << 20, MEM_COMMIT | MEM_RESERVE, PAGE_READWRITE);
    auto window = std::make_unique<testkit::StatusWindow>();
    const ProcessSample grown = sampleProcess() - before;

    EXPECT_GE(grown.handles, 3);
    EXPECT_GE(grown.heapBytes, 5000);
    EXPECT_GE(grown.heapBlocks, 1);
    EXPECT_GE(grown.privateBytes, 1 << 20);
    EXPECT_EQ(grown.windows, 1);

    window.reset();
    VirtualFree(pages, 0, MEM_RELEASE);
    std::free(block);
    for (HANDLE e : events) {
        CloseHandle(e);
    }
    const ProcessSample after = sampleProcess() - before;
    EXPECT_EQ(after.handles, 0);
    EXPECT_EQ(after.windows, 0);
    EXPECT_LT(after.privateBytes, 1 << 20);
}

// Each Vm locks its mutexes; winpthreads allocates their state then, which the host must free.
TEST(ProcessMeter, AJniHostMadeAndDroppedLeavesNoHeap) {
    auto useOne = [] {
        jnihost::Vm vm;
        vm.setViolationHandler([](const std::string&) {});
        vm.newString(u"text");
        vm.env();
    };
    for (int i = 0; i < 20; ++i) {  // first-use allocations of the runtime and the host
        useOne();
    }
    const ProcessSample before = sampleProcess();
    for (int i = 0; i < 200; ++i) {
        useOne();
    }
    const ProcessSample grown = sampleProcess() - before;
    EXPECT_EQ(grown.heapBlocks, 0);
    EXPECT_EQ(grown.heapBytes, 0);
}

TEST(StatusWindow, KeepsTheStatusTextsItIsSent) {
    testkit::StatusWindow window;
    SendMessageA(window.handle(), WM_USER + 100, 0, reinterpret_cast<LPARAM>("first"));
    SendMessageA(window.handle(), WM_USER + 100, 0, reinterpret_cast<LPARAM>("second"));
    EXPECT_EQ(window.received(), (std::vector<std::string>{"first", "second"}));
    EXPECT_FALSE(IsWindow(testkit::StatusWindow::staleHandle()));
}

}  // namespace
