// What the open/save dialogs and the folder browser share: the context their callbacks
// receive, access to the chooser object's fields by class and field name, the owner-window
// search and the placement of a dialog on the object's centre point.
#pragma once

#include <windows.h>

#include <jni.h>

#include <cstdint>

inline constexpr const char kFileChooserClass[] = "com/velmor/coreutil/hack/HackWindowsFileChooser";
inline constexpr const char kDirectoryChooserClass[] = "com/velmor/coreutil/hack/HackWindowsDirectoryChooser";

// Handed to Windows as a dialog's custom data; it lives on the stack of the exported call
// for the length of the modal dialog, whose callbacks run on that same Java thread.
struct ChooserContext {
    JNIEnv* env;
    jobject obj;
    // Set by a callback whose heap allocation failed: the dialog is on screen by then and
    // runs on, and the exported call gives null when it returns.
    bool outOfMemory;
};

// One owner-window search: the process to look for and the first window found.
struct ProcessWindowSearch {
    DWORD processId;
    HWND window;
};

// A failed class or member lookup leaves the virtual machine's error pending; until Java
// sees it, only the calls JNI allows with an exception pending may be made. Every field
// access below checks this first and then falls back as if the field were missing.
inline bool javaErrorPending(JNIEnv* env) {
    return env->ExceptionCheck() == JNI_TRUE;
}

// Java holds a window handle in a long; only its low 32 bits name the window. Window
// handles are 32-bit values on 64-bit Windows too, which sign-extends them to pointer width.
inline HWND windowFromJava(int64_t value) {
    return reinterpret_cast<HWND>(static_cast<LONG_PTR>(static_cast<LONG>(value)));
}

// The field's ID looked up on the class named, or null when the class or field is missing
// (that error is then left pending) or an earlier error is still pending.
jfieldID findFieldByName(JNIEnv* env, const char* className, const char* fieldName, const char* signature);

// The first top-level window of the process as EnumWindows reports it, hidden or not; 0
// when the process has none.
HWND findProcessWindow(DWORD processId);

// The low 32 bits of a long field as a signed value; 0 when the class or field is missing
// or an error is already pending.
jint getLongFieldByName(JNIEnv* env, jobject obj, const char* className, const char* fieldName);

// Writes the handle, sign-extended, into "hwnd"; skipped when the class or field is missing
// or an error is pending.
void storeWindowHandle(JNIEnv* env, jobject obj, const char* className, HWND window);

// Centres the window on ("centerx", "centery"), never at a negative coordinate, then raises
// it and makes it the foreground window.
void centerWindowAt(JNIEnv* env, jobject obj, const char* className, HWND window);
