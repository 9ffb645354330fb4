// The host-side API for what a test controls and observes around a call: the calling
// thread's pending exception, injected failures, and the call counters.
#include "vm_state.h"

namespace jnihost {

bool Vm::exceptionPending() {
    HOST_LOCK;
    return state_->envOfThisThread().pending != nullptr;
}

PendingException Vm::pendingException() {
    HOST_LOCK;
    Obj* e = state_->envOfThisThread().pending;
    if (!e)
        return {};
    const jobject msg = state_->field(e, "detailMessage").l;
    return {e->cls->name, msg ? utf8(objOf(msg)->chars) : std::string()};
}

void Vm::clearException() {
    HOST_LOCK;
    state_->envOfThisThread().pending = nullptr;
}

void Vm::failFindClass(const std::string& className) {
    HOST_LOCK;
    state_->failClass.insert(className);
}

void Vm::failMemberLookup(const std::string& className, const std::string& memberName) {
    HOST_LOCK;
    state_->failMember.emplace(className, memberName);
}

void Vm::failNewObject(const std::string& className) {
    HOST_LOCK;
    state_->failNew.insert(className);
}

void Vm::clearFailures() {
    HOST_LOCK;
    state_->failClass.clear();
    state_->failMember.clear();
    state_->failNew.clear();
}

int Vm::callCount(const std::string& functionName) const {
    for (int i = 0; i < kSlotCount; ++i) {
        if (functionName == kSlotNames[i])
            return state_->counts[i];
    }
    return 0;
}

int Vm::copyBackCount() const {
    return state_->copyBacks;
}

void Vm::resetCallCounts() {
    for (auto& c : state_->counts)
        c = 0;
    state_->copyBacks = 0;
}

}  // namespace jnihost
