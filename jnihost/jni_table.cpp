// The JNIEnv function table: a trap in every slot, then the functions the library is
// expected to use, put in by the file of their concern (jni_classes, jni_objects, jni_calls,
// jni_strings, jni_arrays).
#include <array>
#include <cstdio>
#include <cstring>
#include <utility>

#include "jni_call.h"

namespace jnihost {
namespace {

// For the functions the library is not expected to use. A trap has no sensible value to
// return, so it names its slot and ends the process. It is cdecl without parameters: as it
// never returns, how the caller passed arguments does not matter.
template <int N>
void trap() {
    std::fprintf(stderr, "JNI host: unexpected call to %s\n", kSlotNames[N]);
    terminateProcess(3);
}
template <size_t... I>
std::array<void (*)(), sizeof...(I)> traps(std::index_sequence<I...>) {
    return {{&trap<static_cast<int>(I)>...}};
}

}  // namespace

const JNINativeInterface_* functionTable() {
    static const JNINativeInterface_ table = [] {
        JNINativeInterface_ t;
        const auto all = traps(std::make_index_sequence<kSlotCount>());
        static_assert(sizeof t == sizeof all, "jni_slot_names.inc does not match jni.h: regenerate it");
        std::memcpy(static_cast<void*>(&t), all.data(), sizeof t);
        fillClassSlots(t);
        fillObjectSlots(t);
        fillCallSlots(t);
        fillStringSlots(t);
        fillArraySlots(t);
        return t;
    }();
    return &table;
}

}  // namespace jnihost
