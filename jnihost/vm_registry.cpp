// The registry of live envs and Vms, through which a JNIEnv pointer is checked before it is
// used; violation reports; the env of each thread and the leak check after a library call;
// the Vm's env and violation accessors.
#include <windows.h>

#include <cstdio>

#include "vm_state.h"

namespace jnihost {

// Never destroyed, so that a Vm in a static object may still unregister at exit.
Registry& registry() {
    static Registry* r = new Registry;
    return *r;
}

HostEnv* lookupEnv(const void* env) {
    std::lock_guard<std::mutex> g(registry().mu);
    return registry().envs.count(env) ? static_cast<HostEnv*>(const_cast<void*>(env)) : nullptr;
}

void reportUnknownEnv(const void* env, const char* function) {
    std::unique_lock<std::mutex> g(registry().mu);
    VmState* vm = registry().vms.empty() ? nullptr : registry().vms.back();
    g.unlock();
    const std::string msg = std::string(function) + ": JNIEnv " + hex(env) +
                            " is not an env of this host (stale, or from another Vm)";
    if (vm) {
        vm->report(msg);
    } else {
        std::fprintf(stderr, "JNI host violation: %s\n", msg.c_str());
    }
}

std::string hex(const void* p) {
    char buf[32];
    std::snprintf(buf, sizeof buf, "%p", p);
    return buf;
}

unsigned long currentThreadId() {
    return GetCurrentThreadId();
}

void terminateProcess(unsigned exitCode) {
    std::fflush(nullptr);
    TerminateProcess(GetCurrentProcess(), exitCode);
    std::abort();  // not reached
}

void VmState::report(const std::string& msg) {
    std::unique_lock<std::mutex> g(violationMu);
    violationList.push_back(msg);
    const auto h = handler;
    g.unlock();
    if (h) {
        h(msg);
    } else {
        std::fprintf(stderr, "JNI host violation: %s\n", msg.c_str());
        std::fflush(stderr);
    }
}

HostEnv& VmState::envOfThisThread() {
    std::lock_guard<std::recursive_mutex> g(mu);
    auto& env = envs[GetCurrentThreadId()];
    if (!env) {
        env.reset(new HostEnv{functionTable(), this, GetCurrentThreadId()});
        std::lock_guard<std::mutex> r(registry().mu);
        registry().envs.insert(env.get());
    }
    return *env;
}

void VmState::afterCall(const char* exportName, unsigned long thread, uint64_t serial) {
    std::vector<std::string> leaks;
    {
        std::lock_guard<std::recursive_mutex> g(mu);
        for (auto it = blocks.begin(); it != blocks.end();) {
            const Block& b = it->second;
            if (b.thread != thread || b.serial < serial) {
                ++it;
                continue;
            }
            const bool critical = b.kind == BlockKind::StringCritical || b.kind == BlockKind::ArrayCritical;
            leaks.push_back(std::string(exportName) + ": " + b.takenBy + " of " + describe(b.owner) +
                            (critical ? " still open: critical region not ended" : " never released"));
            it = blocks.erase(it);  // reported once; a late release is then "never handed out"
        }
    }
    for (const auto& leak : leaks)
        report(leak);
}

Vm::Vm() : state_(std::make_unique<VmState>()) {}
Vm::~Vm() = default;
VmState& Vm::state() {
    return *state_;
}
JNIEnv* Vm::env() {
    return reinterpret_cast<JNIEnv*>(&state_->envOfThisThread());
}

void Vm::setViolationHandler(std::function<void(const std::string&)> handler) {
    std::lock_guard<std::mutex> g(state_->violationMu);
    state_->handler = std::move(handler);
}

std::vector<std::string> Vm::violations() const {
    std::lock_guard<std::mutex> g(state_->violationMu);
    return state_->violationList;
}

}  // namespace jnihost
