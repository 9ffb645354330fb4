// The shell folder browser of HackWindowsDirectoryChooser.
#pragma once

#include <windows.h>
#include <shlobj.h>

#include <jni.h>

// The dialog's callback: BFFM_INITIALIZED and BFFM_SELCHANGED go to the two handlers
// below. Always 0.
int CALLBACK browseCallback(HWND dialog, UINT message, LPARAM lParam, LPARAM lpData);

// Records the dialog's handle, centres it and selects the start path. False when the start
// path's text could not be allocated (the dialog then keeps its own selection).
bool onBrowseInitialized(JNIEnv* env, jobject obj, HWND dialog);

// Asks the Java validator about the new selection and enables or disables OK accordingly.
// False when the path could not become a Java string (OK then keeps its state).
bool onSelectionChanged(JNIEnv* env, jobject obj, HWND dialog, LPCITEMIDLIST selection);

// A String field as native text the caller frees; null when the class or field is
// missing, the value is null, an error is pending, or memory runs out (*failed then).
char* getStringFieldByName(JNIEnv* env, jobject obj, const char* className, const char* fieldName,
                           bool* failed);

// 1 to enable OK, 0 to disable it (also when the validator threw), -1 when the validator
// could not be asked (the path could not become a Java string). A missing validator
// interface or method counts as 1.
int callValidator(JNIEnv* env, jobject validator, const char* path);
