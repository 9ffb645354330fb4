// fuzz_exports: a seeded, reproducible fuzz driver of libTessel_JNI.dll's exports through the
// JNI host. Every call must not crash, must break no JNI rule, and must give the documented
// result where there is one; each family's file says what it draws and checks.
//
//   fuzz_exports [--seed N] [--seconds S] [--cases N] [--case I] [--family F] [--trace]
//
// It prints its seed first; the same seed replays the same cases. A failing case prints a
// one-line command that replays it alone (--case I). Without --seed a fresh seed is drawn.
#include <windows.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <string>

#include "fuzz_case.h"
#include "fuzz_run.h"
#include "zelbrin.h"

namespace fuzz {

namespace {

struct Options {
    uint64_t seed = 0;
    bool seeded = false;
    double seconds = 20;
    uint64_t cases = UINT64_MAX;
    int64_t only = -1;  // --case
    std::string family;
    bool trace = false;
};

// The case now running, for the crash report and for the breadcrumb that the wrapper script
// reads when the process dies without a word (the host ends it on a JNI function the library
// must not use).
struct Current {
    uint64_t seed = 0;
    uint64_t index = 0;
    const Case* running = nullptr;
    char* breadcrumb = nullptr;  // a mapped file: it survives the process
} current;

std::string replayCommand(uint64_t seed, uint64_t index) {
    return "scripts/testbed scripts/fuzz-exports --seed " + std::to_string(seed) + " --case " +
           std::to_string(index);
}

void openBreadcrumb() {
    const char* path = std::getenv("TESSEL_FUZZ_BREADCRUMB");
    if (path == nullptr || *path == '\0') {
        return;
    }
    HANDLE file = CreateFileA(path, GENERIC_READ | GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                              CREATE_ALWAYS, 0, nullptr);
    if (file == INVALID_HANDLE_VALUE) {
        return;
    }
    HANDLE mapping = CreateFileMappingA(file, nullptr, PAGE_READWRITE, 0, 256, nullptr);
    if (mapping != nullptr) {
        current.breadcrumb = static_cast<char*>(MapViewOfFile(mapping, FILE_MAP_WRITE, 0, 0, 256));
    }
    // Both handles stay open for the life of the process, and the view with them.
}

void markBreadcrumb() {
    if (current.breadcrumb != nullptr) {
        std::snprintf(current.breadcrumb, 256, "%s\n", replayCommand(current.seed, current.index).c_str());
    }
}

LONG WINAPI onCrash(EXCEPTION_POINTERS* info) {
    std::fprintf(stderr, "CRASH: exception 0x%08lx at %p in case %llu (%s, during %s)\nreplay: %s\n",
                 info->ExceptionRecord->ExceptionCode, info->ExceptionRecord->ExceptionAddress,
                 static_cast<unsigned long long>(current.index),
                 current.running ? current.running->family.c_str() : "?",
                 current.running ? current.running->step.c_str() : "?",
                 replayCommand(current.seed, current.index).c_str());
    std::fflush(stderr);
    if (current.breadcrumb != nullptr) {
        std::memset(current.breadcrumb, 0, 256);  // reported here already
    }
    TerminateProcess(GetCurrentProcess(), 2);
    return EXCEPTION_EXECUTE_HANDLER;
}

bool parse(int argc, char** argv, Options* o) {
    for (int i = 1; i < argc; ++i) {
        const std::string a = argv[i];
        const char* v = i + 1 < argc ? argv[i + 1] : nullptr;
        if (a == "--trace") {
            o->trace = true;
            continue;
        }
        if (v == nullptr) {
            return false;
        }
        ++i;
        if (a == "--seed") {
            o->seed = std::strtoull(v, nullptr, 10);
            o->seeded = true;
        } else if (a == "--seconds") {
            o->seconds = std::atof(v);
        } else if (a == "--cases") {
            o->cases = std::strtoull(v, nullptr, 10);
        } else if (a == "--case") {
            o->only = std::strtoll(v, nullptr, 10);
        } else if (a == "--family") {
            o->family = v;
        } else {
            return false;
        }
    }
    return true;
}

using Family = void (*)(Case&, Run&);

// The family of a case, drawn from its own stream (or the one asked for).
Family familyOf(Case& c, const std::string& only) {
    static const std::map<std::string, Family> byName = {{"velzip", fuzzVelzip},
                                                         {"registry", fuzzRegistry},
                                                         {"desktop", fuzzDesktop},
                                                         {"windows", fuzzWindows}};
    const auto it = byName.find(only);
    if (it != byName.end()) {
        return it->second;
    }
    const uint32_t r = c.rng.below(100);
    return r < 40 ? fuzzVelzip : r < 70 ? fuzzRegistry : r < 85 ? fuzzDesktop : fuzzWindows;
}

}  // namespace

Case::Case(uint64_t runSeed, uint64_t caseIndex)
    : seed(runSeed), index(caseIndex), rng(caseSeed(runSeed, caseIndex)) {
    vm.setViolationHandler([this](const std::string& what) { fail("JNI rule broken: " + what); });
}

Case::~Case() {
    vm.setViolationHandler({});
}

void Case::note(const char* exportName) {
    ++calls;
    step = exportName;
    if (traceCalls) {
        std::fprintf(stderr, "  case %llu: %s\n", static_cast<unsigned long long>(index), exportName);
    }
}

void Case::fail(const std::string& what) {
    failures.push_back((step.empty() ? "" : step + ": ") + what);
}

jnihost::PendingException Case::takeException() {
    jnihost::PendingException e = vm.pendingException();
    vm.clearException();
    return e;
}

Run::Run(uint64_t runSeed) : seed(runSeed) {
    Rng rng(runSeed);
    scratch = u16(dir.wpath()) + u"\\scratch";
    CreateDirectoryW(wide(scratch).c_str(), nullptr);
    corpus = buildCorpus(rng, u16(dir.wpath()));
    compressorsBefore = ZelTest_CompressorsCreated();
    makeWindowTargets(&windows);
}

Run::~Run() {
    destroyWindowTargets(&windows);
}

}  // namespace fuzz

int main(int argc, char** argv) {
    using namespace fuzz;
    if (argc == 3 && std::strcmp(argv[1], "--foreign-window") == 0) {
        return foreignWindowMain(std::strtoul(argv[2], nullptr, 10));
    }
    Options o;
    if (!parse(argc, argv, &o)) {
        std::fprintf(
            stderr,
            "usage: fuzz_exports [--seed N] [--seconds S] [--cases N] [--case I] [--family F] [--trace]\n");
        return 2;
    }
    if (!o.seeded) {
        o.seed =
            (static_cast<uint64_t>(GetTickCount()) << 32 ^ GetCurrentProcessId() ^
             static_cast<uint64_t>(std::chrono::high_resolution_clock::now().time_since_epoch().count())) %
            1000000000000ull;
    }
    traceCalls = o.trace;
    std::printf("fuzz_exports: seed %llu\n", static_cast<unsigned long long>(o.seed));
    std::fflush(stdout);
    SetUnhandledExceptionFilter(onCrash);
    openBreadcrumb();
    current.seed = o.seed;
    HMODULE pin = LoadLibraryA("libTessel_JNI.dll");  // one load for the run; cases load it again
    if (pin == nullptr) {
        std::fprintf(stderr, "fuzz_exports: libTessel_JNI.dll does not load\n");
        return 2;
    }

    Run run(o.seed);
    const auto start = std::chrono::steady_clock::now();
    std::map<std::string, long> casesBy, callsBy;
    long failedCases = 0;
    uint64_t done = 0;
    const uint64_t first = o.only >= 0 ? static_cast<uint64_t>(o.only) : 0;
    const uint64_t last = o.only >= 0 ? first + 1 : o.cases;
    for (uint64_t i = first; i < last; ++i) {
        if (o.only < 0 &&
            std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count() >= o.seconds) {
            break;
        }
        current.index = i;
        markBreadcrumb();
        Case c(o.seed, i);
        current.running = &c;
        familyOf(c, o.family)(c, run);
        current.running = nullptr;
        ++done;
        ++casesBy[c.family];
        callsBy[c.family] += c.calls;
        if (!c.failures.empty()) {
            ++failedCases;
            std::printf("FAIL case %llu (%s): %s\n", static_cast<unsigned long long>(i), c.family.c_str(),
                        c.failures.front().c_str());
            for (size_t k = 1; k < c.failures.size() && k < 4; ++k) {
                std::printf("    and: %s\n", c.failures[k].c_str());
            }
            std::printf("replay: %s\n", replayCommand(o.seed, i).c_str());
            std::fflush(stdout);
        }
    }
    const double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    long calls = 0;
    std::string split;
    for (const auto& [family, n] : callsBy) {
        calls += n;
        split += (split.empty() ? "" : ", ") + family + " " + std::to_string(casesBy[family]) + " cases/" +
                 std::to_string(n) + " calls";
    }
    std::printf(
        "fuzz_exports: seed %llu, %llu cases (%s), %ld calls in %.1f s; replay the run with --seed %llu "
        "--cases %llu\n",
        static_cast<unsigned long long>(o.seed), static_cast<unsigned long long>(done), split.c_str(), calls,
        seconds, static_cast<unsigned long long>(o.seed), static_cast<unsigned long long>(first + done));
    if (run.envNamesSkipped > 0) {
        std::printf(
            "fuzz_exports: %ld environment names of 32,767-65,535 bytes skipped (Wine's "
            "GetEnvironmentVariableA crashes on them)\n",
            run.envNamesSkipped);
    }
    std::printf("fuzz_exports: %ld failing cases\n", failedCases);
    if (current.breadcrumb != nullptr) {
        std::memset(current.breadcrumb, 0, 256);  // ended on its own
    }
    FreeLibrary(pin);
    return failedCases == 0 ? 0 : 1;
}
