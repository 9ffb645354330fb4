// The chooser family's exports and the Java values they take and give, for calling
// libTessel_JNI.dll the way the Java classes HackWindowsFileChooser and
// HackWindowsDirectoryChooser do, through the JNI host. It asserts nothing.
#pragma once

#include <windows.h>

#include <cstdint>
#include <string>
#include <vector>

#include "jnihost.h"

namespace testkit::chooser {

// The decorated export names (stdcall, argument bytes after the @).
#define TESTKIT_HACK "_Java_com_velmor_coreutil_hack_"
constexpr char kActivate[] = TESTKIT_HACK "HackWindowsFileChooser_nativeActivateWindow@16";
constexpr char kOpen[] = TESTKIT_HACK "HackWindowsFileChooser_nativeBrowseForFile@28";
constexpr char kSave[] = TESTKIT_HACK "HackWindowsFileChooser_nativeBrowseForSaveFile@28";
constexpr char kBrowse[] = TESTKIT_HACK "HackWindowsDirectoryChooser_nativeBrowseForFolder@8";
constexpr char kSetStatus[] = TESTKIT_HACK "HackWindowsDirectoryChooser_nativeSetStatus@12";
#undef TESTKIT_HACK

// A Java String[] of these texts; a null pointer gives a null element.
inline jobjectArray stringArray(jnihost::Vm& vm, const std::vector<const char*>& texts) {
    std::vector<jobject> elements;
    for (const char* text : texts) {
        elements.push_back(text ? vm.newStringUtf8(text) : nullptr);
    }
    return vm.newStringArray(elements);
}

// The texts of a Java String[] ("<null>" for a null element); empty for a null array.
inline std::vector<std::string> strings(jnihost::Vm& vm, jobject array) {
    std::vector<std::string> out;
    for (jobject s : array ? vm.objectArrayValue(array) : std::vector<jobject>{}) {
        out.push_back(s ? vm.stringUtf8(s) : "<null>");
    }
    return out;
}

// A chooser object with its centre point ("centerx", "centery") set.
inline jobject newChooser(jnihost::Vm& vm, const char* className, int64_t cx, int64_t cy) {
    jobject chooser = vm.newInstance(className);
    vm.setLongField(chooser, "centerx", cx);
    vm.setLongField(chooser, "centery", cy);
    return chooser;
}

// The window the library wrote into the object's "hwnd": the low 32 bits of the long.
inline HWND dialogOf(jnihost::Vm& vm, jobject chooser) {
    return reinterpret_cast<HWND>(
        static_cast<uintptr_t>(static_cast<uint32_t>(vm.longField(chooser, "hwnd"))));
}

}  // namespace testkit::chooser
