// soak: long loops of each family of libTessel_JNI.dll's exports, and thread churn, under
// Wine through the JNI host. The process is measured before, at the middle and after each
// family's loop (handles, heap in use and its blocks, private bytes, windows); the growth per
// 1,000 calls is printed, and the soak fails above one handle or 1 KiB of heap per 10,000
// calls. `make soak`; not part of `make test`.
//
//   soak [--scale F]   F multiplies every family's number of calls (default 1)
#include <windows.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "process_meter.h"
#include "registry_kit.h"
#include "soak.h"

namespace {

using soak::Context;
using soak::Host;
using Round = long (*)(Host&, Context&, long);

struct Family {
    const char* name;
    Round round;
    long calls;   // in each half of the measured loop
    bool judged;  // the bare and host-only churns are baselines, not the library's
};

struct Growth {
    long calls = 0;
    testkit::ProcessSample all, firstHalf;
    long firstCalls = 0;
};

// The calls of one family, on a fresh host every `chunk` calls.
long run(Context& ctx, Round round, long calls, long chunk) {
    long made = 0;
    while (made < calls) {
        Host host;
        host.vm.setViolationHandler(
            [&ctx](const std::string& what) { ctx.fault("JNI rule broken: " + what); });
        made += round(host, ctx, std::min(chunk, calls - made));
        host.vm.setViolationHandler({});
    }
    return made;
}

double per1000(double growth, long calls) {
    return growth * 1000.0 / static_cast<double>(calls);
}

void printRow(const char* name, const Growth& g, double seconds) {
    std::printf("%-13s %7ld %7.1f %5.2f [%5.2f] %7.1f [%7.1f] %5.2f [%5.2f] %12.1f %8ld\n", name, g.calls,
                seconds, per1000(g.all.handles, g.calls), per1000(g.firstHalf.handles, g.firstCalls),
                per1000(g.all.heapBytes, g.calls), per1000(g.firstHalf.heapBytes, g.firstCalls),
                per1000(g.all.heapBlocks, g.calls), per1000(g.firstHalf.heapBlocks, g.firstCalls),
                per1000(g.all.privateBytes, g.calls), g.all.windows);
    std::fflush(stdout);
}

// More than one handle or 1 KiB of heap per 10,000 calls, or a window left, is a leak.
bool overLimit(const char* name, const Growth& g) {
    const bool over = g.all.handles * 10000.0 / g.calls > 1.0 ||
                      g.all.heapBytes * 10000.0 / g.calls > 1024.0 || g.all.windows > 0;
    if (over) {
        std::printf("soak: %s grows beyond the limit: %s over %ld calls\n", name,
                    testkit::describe(g.all).c_str(), g.calls);
    }
    return over;
}

}  // namespace

int main(int argc, char** argv) {
    double scale = 1.0;
    if (argc == 3 && std::strcmp(argv[1], "--scale") == 0) {
        scale = std::atof(argv[2]);
    }
    HMODULE pin = LoadLibraryA("libTessel_JNI.dll");  // loaded once for the soak, not per host
    if (pin == nullptr) {
        std::fprintf(stderr, "soak: libTessel_JNI.dll does not load\n");
        return 2;
    }
    Context ctx;
    ctx.registryKey = "Software\\TesselSoak-" + std::to_string(GetCurrentProcessId());
    ctx.window = std::make_unique<testkit::StatusWindow>();

    const Family families[] = {
        {"registry", soak::registryRound, 12000, true},
        {"velzip", soak::velzipRound, 15000, true},
        {"codec", soak::codecRound, 6000, true},
        {"desktop", soak::desktopRound, 15000, true},
        {"windows", soak::windowsRound, 20000, true},
        {"threads-bare", soak::threadBareRound, 8000, false},
        {"threads-env", soak::threadEnvRound, 8000, false},
        {"threads", soak::threadChurnRound, 8000, false},
    };
    std::printf("soak: growth per 1,000 calls from before to after; in brackets the first half alone\n");
    std::printf("%-13s %7s %7s %13s %17s %13s %12s %8s\n", "family", "calls", "seconds", "handles/1k",
                "heap B/1k", "blocks/1k", "private B/1k", "windows");
    std::fflush(stdout);
    bool over = false;
    long total = 0;
    const auto soakStart = std::chrono::steady_clock::now();
    Growth envOnly;
    for (const Family& f : families) {
        const long half = static_cast<long>(f.calls * scale);
        total += run(ctx, f.round, half / 5 + 1, 400);  // warm-up: caches, first-use allocations
        const auto start = std::chrono::steady_clock::now();
        const testkit::ProcessSample before = testkit::sampleProcess();
        Growth g;
        g.firstCalls = run(ctx, f.round, half, 400);
        const testkit::ProcessSample middle = testkit::sampleProcess();
        g.calls = g.firstCalls + run(ctx, f.round, half, 400);
        const testkit::ProcessSample after = testkit::sampleProcess();
        g.all = after - before;
        g.firstHalf = middle - before;
        total += g.calls;
        printRow(f.name, g, std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
        if (f.judged) {
            over = overLimit(f.name, g) || over;
        } else if (std::strcmp(f.name, "threads-env") == 0) {
            envOnly = g;
        } else if (std::strcmp(f.name, "threads") == 0) {
            // What the library's calls add per thread, beyond Wine's and the host's own share.
            Growth net = g;
            net.all = g.all - envOnly.all;
            net.firstHalf = g.firstHalf - envOnly.firstHalf;
            printRow("threads (net)", net, 0);
            over = overLimit("threads (net)", net) || over;
        }
    }
    RegDeleteTreeA(HKEY_CURRENT_USER, ctx.registryKey.c_str());
    ctx.window.reset();
    FreeLibrary(pin);
    const double seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - soakStart).count();
    std::printf("soak: %ld calls in %.0f s; %ld wrong results or broken JNI rules; %s\n", total, seconds,
                ctx.faults, over || ctx.faults > 0 ? "FAILED" : "passed");
    return over || ctx.faults > 0 ? 1 : 0;
}
