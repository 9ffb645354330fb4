// Thread churn: short-lived threads, four at a time, each taking its own env from the host
// and calling exports of every family once, then ending. The main thread pumps messages while
// it waits, so the status texts the threads send to its window are delivered.
#include <windows.h>

#include <vector>

#include "chooser_client.h"
#include "desktop_client.h"
#include "registry_kit.h"
#include "soak.h"
#include "velzip_client.h"

namespace soak {

namespace {

constexpr int kCallsPerThread = 8;
constexpr int kThreadsAtOnce = 4;

enum class Work { Bare, HostEnv, Exports };

struct ThreadWork {
    Host* host;
    Context* ctx;
    jlong window;
    Work work;
};

DWORD WINAPI churnThread(void* parameter) {
    const auto* work = static_cast<ThreadWork*>(parameter);
    if (work->work == Work::Bare) {
        return 0;
    }
    Host& h = *work->host;
    Context& ctx = *work->ctx;
    if (work->work == Work::HostEnv) {
        h.vm.env();
        jobject chooser =
            h.vm.newInstance(jnihost::kDirectoryChooserClass);  // the objects a thread's calls make
        h.vm.setLongField(chooser, "hwnd", work->window);
        h.vm.newStringUtf8("TESSEL_SOAK_VAR");
        return 0;
    }
    jnihost::Library& lib = h.lib;
    bool ok = lib.call<jstring>(testkit::desktop::kGetEnv, jclass{}, h.vm.newStringUtf8("TESSEL_SOAK_VAR")) !=
              nullptr;
    ok = lib.call<jobject>(testkit::desktop::kGetCursorPos, jclass{}) != nullptr && ok;
    jobject value = lib.call<jobject>(regkit::kGetValue, jclass{}, static_cast<jint>(0x80000001),
                                      h.vm.newStringUtf8(ctx.registryKey), h.vm.newStringUtf8("v1"));
    ok = value != nullptr && ok;
    {
        std::lock_guard<std::mutex> turn(ctx.velzipTurn);
        testkit::VelzipClient vz(h.vm, lib);
        ok = vz.pack(std::vector<uint8_t>(1000, 'x')).size() > 16 && ok;
        ok = vz.intCall(testkit::vz::kHeaderBytes) == 16 && ok;
        vz.errorId();
    }
    jobject chooser = h.vm.newInstance(jnihost::kDirectoryChooserClass);
    h.vm.setLongField(chooser, "hwnd", work->window);
    lib.call<void>(testkit::chooser::kSetStatus, chooser, h.vm.newStringUtf8("from a short-lived thread"));
    lib.call<void>(testkit::chooser::kActivate, jclass{}, jlong{0});
    if (!ok) {
        ctx.fault("a call on a short-lived thread gave a wrong result");
    }
    return 0;
}

// Waits for the threads, delivering messages sent to this thread's windows meanwhile.
void waitPumping(std::vector<HANDLE>& threads) {
    while (!threads.empty()) {
        const DWORD r = MsgWaitForMultipleObjects(static_cast<DWORD>(threads.size()), threads.data(), FALSE,
                                                  5000, QS_ALLINPUT);
        if (r < WAIT_OBJECT_0 + threads.size()) {
            CloseHandle(threads[r - WAIT_OBJECT_0]);
            threads.erase(threads.begin() + (r - WAIT_OBJECT_0));
            continue;
        }
        MSG msg;
        while (PeekMessageA(&msg, nullptr, 0, 0, PM_REMOVE)) {
            DispatchMessageA(&msg);
        }
    }
}

// `calls` counts kCallsPerThread per thread in every kind of round, so the rows compare.
long churn(Host& host, Context& ctx, long calls, Work kind) {
    const jlong window =
        static_cast<jlong>(static_cast<int32_t>(reinterpret_cast<intptr_t>(ctx.window->handle())));
    ThreadWork work{&host, &ctx, window, kind};
    long made = 0;
    ctx.window->clear();
    long threads = 0;
    while (made < calls) {
        std::vector<HANDLE> running;
        for (int i = 0; i < kThreadsAtOnce; ++i) {
            HANDLE t = CreateThread(nullptr, 0, churnThread, &work, 0, nullptr);
            if (t == nullptr) {
                ctx.fault("CreateThread failed");
                return made;
            }
            running.push_back(t);
            made += kCallsPerThread;
            ++threads;
        }
        waitPumping(running);
    }
    if (kind == Work::Exports && static_cast<long>(ctx.window->received().size()) != threads) {
        ctx.fault("status texts from short-lived threads went missing");
    }
    ctx.window->clear();
    return made;
}

}  // namespace

long threadBareRound(Host& host, Context& ctx, long calls) {
    return churn(host, ctx, calls, Work::Bare);
}

long threadEnvRound(Host& host, Context& ctx, long calls) {
    return churn(host, ctx, calls, Work::HostEnv);
}

long threadChurnRound(Host& host, Context& ctx, long calls) {
    return churn(host, ctx, calls, Work::Exports);
}

}  // namespace soak
