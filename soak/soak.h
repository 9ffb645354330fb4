// The soak: long loops of each family's exports, and thread churn, with the process measured
// before, at the middle and after (testkit/process_meter.h). A loop counts the export calls it
// makes and checks their results enough to know the work was really done; its JNI host is
// made anew every few hundred calls (Host below), so the host's own objects, which live as
// long as their Vm, are gone again at every measurement.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <string>

#include "jnihost.h"
#include "status_window.h"
#include "temp_folder.h"

namespace soak {

// A JNI host with the library loaded; one per chunk of calls.
struct Host {
    Host();
    jnihost::Vm vm;
    jnihost::Library lib{vm};
};

// What the loops share for the whole soak.
struct Context {
    testkit::TempFolder dir;
    std::string registryKey;  // below HKCU, the soak's own, removed at the end
    std::unique_ptr<testkit::StatusWindow> window;
    std::mutex velzipTurn;  // the Velzip family is called from one thread at a time
    uint32_t random = 12345;
    long faults = 0;  // results that show the work was not done, and JNI rules broken
    uint32_t next() {
        random ^= random << 13;
        random ^= random >> 17;
        random ^= random << 5;
        return random;
    }
    void fault(const std::string& what);
};

// One round of a family: about `calls` export calls on `host`; returns the calls made.
long registryRound(Host& host, Context& ctx, long calls);
long velzipRound(Host& host, Context& ctx, long calls);
long codecRound(Host& host, Context& ctx, long calls);
long desktopRound(Host& host, Context& ctx, long calls);
long windowsRound(Host& host, Context& ctx, long calls);
// Short-lived threads, each with its own env, each calling exports of every family; and the
// same churn bare (no host, no call) and with the host's part alone (an env and the objects
// the calls make), to measure around what Wine and the host keep per thread.
long threadChurnRound(Host& host, Context& ctx, long calls);
long threadBareRound(Host& host, Context& ctx, long calls);
long threadEnvRound(Host& host, Context& ctx, long calls);

}  // namespace soak
