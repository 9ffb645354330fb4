#include <cstdio>

#include "tour.h"

void tourDesktop(jnihost::Vm& vm, jnihost::Library& lib) {
    const char* prefix = "_Java_com_velmor_coreutil_corenative_CoreNativeNT_";
    auto name = [&](const char* method) { return std::string(prefix) + method; };
    std::printf("\nCoreNativeNT\n");

    jboolean moved = lib.call<jboolean>(name("setCursorPos@12").c_str(), jclass{}, vm.newPoint(200, 150));
    jobject point = lib.call<jobject>(name("getCursorPos@8").c_str(), jclass{});
    if (point != nullptr) {
        auto [x, y] = vm.pointValue(point);
        std::printf("  setCursorPos(200, 150) -> %s; getCursorPos() -> (%d, %d)\n", moved ? "true" : "false",
                    static_cast<int>(x), static_cast<int>(y));
    }

    for (const char* variable : {"WINEPREFIX", "TESSEL_UNDEFINED_VARIABLE"}) {
        jstring value =
            lib.call<jstring>(name("getEnvVariable@12").c_str(), jclass{}, vm.newStringUtf8(variable));
        std::printf("  getEnvVariable(\"%s\") -> %s\n", variable,
                    value ? ("\"" + vm.stringUtf8(value) + "\"").c_str() : "null");
    }

    for (jint folder : {5, 26, 0x7ff0}) {
        jstring path = lib.call<jstring>(name("getSpecialFolderLocation@12").c_str(), jclass{}, folder);
        std::printf("  getSpecialFolderLocation(%d) -> %s\n", static_cast<int>(folder),
                    path ? ("\"" + vm.stringUtf8(path) + "\"").c_str() : "null");
    }
}
