// What every part of the fuzz driver shares: the random source, one case (a fresh JNI host
// with the library, the case's own random stream, and what went wrong in it), and the
// resources a whole run builds once (files, a registry key, windows).
//
// A run is a numbered series of cases. Case i draws everything from a stream seeded by
// (run seed, i) and starts from a known state, so `--seed S --case i` replays it alone.
#pragma once

#include <jni.h>

#include <cstdint>
#include <string>
#include <vector>

#include "jnihost.h"

namespace fuzz {

// splitmix64: small, fast and the same everywhere, so a seed replays on any build.
class Rng {
public:
    explicit Rng(uint64_t seed) : state_(seed) {}
    uint64_t next() {
        uint64_t z = (state_ += 0x9E3779B97F4A7C15ull);
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
        z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
        return z ^ (z >> 31);
    }
    // 0 .. n-1 (0 for n 0).
    uint32_t below(uint32_t n) { return n == 0 ? 0 : static_cast<uint32_t>(next() % n); }
    // lo .. hi, both included.
    int64_t range(int64_t lo, int64_t hi) {
        return lo + static_cast<int64_t>(next() % static_cast<uint64_t>(hi - lo + 1));
    }
    bool chance(int percent) { return below(100) < static_cast<uint32_t>(percent); }
    template <class T>
    const T& pick(const std::vector<T>& items) {
        return items[below(static_cast<uint32_t>(items.size()))];
    }

private:
    uint64_t state_;
};

// The stream of case `index` of the run with `seed`.
inline uint64_t caseSeed(uint64_t seed, uint64_t index) {
    Rng mix(seed ^ (index * 0xD1B54A32D192ED03ull));
    mix.next();
    return mix.next();
}

struct Run;

// --trace: every export is printed as it is called.
inline bool traceCalls = false;

// One case. Checks report through fail(); the host's violation reports land there too.
struct Case {
    Case(uint64_t runSeed, uint64_t caseIndex);
    ~Case();
    Case(const Case&) = delete;
    Case& operator=(const Case&) = delete;

    // Calls a static native (the class argument is null, as the library never reads it).
    template <class R, class... A>
    R call(const char* exportName, A... args) {
        note(exportName);
        return lib.call<R>(exportName, jclass{}, args...);
    }
    // Calls an instance native on `self`.
    template <class R, class... A>
    R callOn(const char* exportName, jobject self, A... args) {
        note(exportName);
        return lib.call<R>(exportName, self, args...);
    }

    void note(const char* exportName);
    void fail(const std::string& what);
    // Records a failure unless `ok`; `what` is built only then.
    template <class Describe>
    void expect(bool ok, Describe what) {
        if (!ok) {
            fail(what());
        }
    }

    // The pending exception, cleared; empty class name when none was pending.
    jnihost::PendingException takeException();

    uint64_t seed;
    uint64_t index;
    Rng rng;
    jnihost::Vm vm;
    jnihost::Library lib{vm};
    std::string family;
    std::string step;  // the export being called, for messages
    long calls = 0;
    std::vector<std::string> failures;
};

// Families: each runs a short random sequence of calls of its exports in one case.
void fuzzVelzip(Case& c, Run& run);
void fuzzRegistry(Case& c, Run& run);
void fuzzDesktop(Case& c, Run& run);
void fuzzWindows(Case& c, Run& run);

}  // namespace fuzz
