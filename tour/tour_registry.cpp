// The registry family: a small table written, read back one value and all values, then the
// tour's own key removed (refused first while it still holds a key, then recursively).
#include <cstdio>
#include <string>

#include "tour.h"

namespace {

// HKEY_CURRENT_USER as the Java side passes it.
const jint kCurrentUser = static_cast<jint>(0x80000001);

std::string show(jnihost::Vm& vm, jobject value) {
    if (value == nullptr) {
        return "null";
    }
    const std::string cls = vm.classNameOf(value);
    if (cls == "java/lang/String") {
        return "\"" + vm.stringUtf8(value) + "\"";
    }
    if (cls == "java/lang/Integer") {
        return "Integer " + std::to_string(vm.integerValue(value));
    }
    std::string text = "byte[] {";
    for (uint8_t b : vm.byteArrayValue(value)) {
        text += " " + std::to_string(b);
    }
    return text + " }";
}

// The pending exception's message, cleared; empty when none.
std::string raised(jnihost::Vm& vm) {
    if (!vm.exceptionPending()) {
        return "";
    }
    const std::string message = vm.pendingException().message;
    vm.clearException();
    return message;
}

}  // namespace

void tourRegistry(jnihost::Vm& vm, jnihost::Library& lib) {
    const char* prefix = "_Java_com_velmor_coreutil_io_WinRegistry_";
    auto name = [&](const char* method) { return std::string(prefix) + method; };
    const std::string keyText = "Software\\TesselTour\\Registry";
    jstring key = vm.newStringUtf8(keyText);
    std::printf("\nWinRegistry (HKEY_CURRENT_USER\\%s)\n", keyText.c_str());

    jobject table = vm.newHashtable();
    vm.hashtablePut(table, vm.newStringUtf8("greeting"), vm.newStringUtf8("hello, registry"));
    vm.hashtablePut(table, vm.newStringUtf8("answer"), vm.newInteger(-42));
    vm.hashtablePut(table, vm.newStringUtf8("bytes"), vm.newByteArray({0xca, 0xfe, 0x00, 0x01}));
    lib.call<void>(name("nativeSetRegistryValues@20").c_str(), jclass{}, kCurrentUser, key, table);
    std::printf("  nativeSetRegistryValues(3 entries) %s\n", raised(vm).empty() ? "done" : "failed");

    jobject answer = lib.call<jobject>(name("nativeGetRegistryValue@20").c_str(), jclass{}, kCurrentUser, key,
                                       vm.newStringUtf8("answer"));
    std::printf("  nativeGetRegistryValue(\"answer\") -> %s\n", show(vm, answer).c_str());

    jobject back = lib.call<jobject>(name("nativeGetRegistryValues@16").c_str(), jclass{}, kCurrentUser, key);
    if (back != nullptr) {
        std::printf("  nativeGetRegistryValues() ->\n");
        for (auto [k, v] : vm.hashtableEntries(back)) {
            std::printf("    %s = %s\n", vm.stringUtf8(k).c_str(), show(vm, v).c_str());
        }
    }

    jstring tourKey = vm.newStringUtf8("Software\\TesselTour");
    lib.call<void>(name("nativeDeleteRegistryKey@20").c_str(), jclass{}, kCurrentUser, tourKey,
                   jboolean{JNI_FALSE});
    std::printf("  nativeDeleteRegistryKey(\"Software\\TesselTour\", recursive false) -> %s\n",
                raised(vm).c_str());
    lib.call<void>(name("nativeDeleteRegistryKey@20").c_str(), jclass{}, kCurrentUser, tourKey,
                   jboolean{JNI_TRUE});
    std::printf("  nativeDeleteRegistryKey(\"Software\\TesselTour\", recursive true) %s\n",
                raised(vm).empty() ? "done" : "failed");

    jobject gone = lib.call<jobject>(name("nativeGetRegistryValues@16").c_str(), jclass{}, kCurrentUser, key);
    std::printf("  nativeGetRegistryValues() afterwards -> %s (%s)\n", gone ? "a table" : "null",
                raised(vm).c_str());
}
