// Owner-window search, the chooser object's long fields, dialog placement, and
// nativeActivateWindow.
#include "choosers/chooser_window.h"

#include <cstdint>

#include "com_velmor_coreutil_hack_HackWindowsFileChooser.h"

namespace {

BOOL CALLBACK matchProcessWindow(HWND window, LPARAM parameter) {
    auto* search = reinterpret_cast<ProcessWindowSearch*>(parameter);
    DWORD owner = 0;
    GetWindowThreadProcessId(window, &owner);
    if (owner != search->processId) {
        return TRUE;
    }
    search->window = window;
    return FALSE;  // the first window of the process wins
}

// Coordinates are clamped at 0 so that a centre near the top or left edge never pushes
// the dialog off screen; the arithmetic is wide so no centre value can overflow.
int clampedOrigin(jint centre, LONG low, LONG high) {
    const int64_t origin = int64_t{centre} - (int64_t{high} - int64_t{low}) / 2;
    if (origin <= 0) {
        return 0;
    }
    return origin > INT32_MAX ? INT32_MAX : static_cast<int>(origin);
}

}  // namespace

jfieldID findFieldByName(JNIEnv* env, const char* className, const char* fieldName, const char* signature) {
    if (javaErrorPending(env)) {
        return nullptr;
    }
    jclass cls = env->FindClass(className);  // by name, never the object's own class
    if (cls == nullptr) {
        return nullptr;
    }
    return env->GetFieldID(cls, fieldName, signature);
}

HWND findProcessWindow(DWORD processId) {
    ProcessWindowSearch search{processId, nullptr};
    EnumWindows(matchProcessWindow, reinterpret_cast<LPARAM>(&search));
    return search.window;
}

jint getLongFieldByName(JNIEnv* env, jobject obj, const char* className, const char* fieldName) {
    jfieldID field = findFieldByName(env, className, fieldName, "J");
    if (field == nullptr) {
        return 0;
    }
    return static_cast<jint>(static_cast<uint32_t>(env->GetLongField(obj, field)));
}

void storeWindowHandle(JNIEnv* env, jobject obj, const char* className, HWND window) {
    jfieldID field = findFieldByName(env, className, "hwnd", "J");
    if (field == nullptr) {
        return;
    }
    // Sign-extended, so Java sees the same value that nativeActivateWindow takes back.
    const auto handle = static_cast<int32_t>(reinterpret_cast<intptr_t>(window));
    env->SetLongField(obj, field, static_cast<jlong>(handle));
}

void centerWindowAt(JNIEnv* env, jobject obj, const char* className, HWND window) {
    const jint cx = getLongFieldByName(env, obj, className, "centerx");
    const jint cy = getLongFieldByName(env, obj, className, "centery");
    RECT frame;
    if (GetWindowRect(window, &frame)) {
        SetWindowPos(window, HWND_TOP, clampedOrigin(cx, frame.left, frame.right),
                     clampedOrigin(cy, frame.top, frame.bottom), 0, 0, SWP_NOSIZE);
    } else {
        // Without its size the window cannot be centred: leave it where it is, but still
        // bring it to the top.
        SetWindowPos(window, HWND_TOP, 0, 0, 0, 0, SWP_NOSIZE | SWP_NOMOVE);
    }
    UpdateWindow(window);
    SetForegroundWindow(window);
}

extern "C" {

void JNICALL Java_com_velmor_coreutil_hack_HackWindowsFileChooser_nativeActivateWindow(JNIEnv*, jclass,
                                                                                       jlong windowHandle) {
    HWND window = windowFromJava(windowHandle);
    if (window == nullptr) {
        return;  // no dialog shown; 2^32 and its multiples land here too
    }
    SetWindowPos(window, HWND_TOP, 0, 0, 0, 0, SWP_NOSIZE | SWP_NOMOVE);
    UpdateWindow(window);
    SetForegroundWindow(window);
}

}  // extern "C"
