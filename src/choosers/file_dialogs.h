// The Explorer-style open and save dialogs of HackWindowsFileChooser.
#pragma once

#include <windows.h>
#include <commdlg.h>

#include <jni.h>

// The Windows filter list (NUL-terminated texts, then at least four more NULs) built from
// the Java array in its order, in a calloc block the caller frees. Null elements are
// skipped. Null when there is no filter (null or empty array, or only null or empty
// texts) and when memory runs out; *failed tells the two apart.
char* buildFilterList(JNIEnv* env, jobjectArray filters, bool* failed);

// The hook of both dialogs: once the dialog is ready, it is centred, raised and its handle
// stored in the chooser object. Always 0, so the dialog's own processing goes on.
UINT_PTR CALLBACK fileDialogHook(HWND dialog, UINT message, WPARAM wParam, LPARAM lParam);

// The chosen paths as a Java string array: the single path as Windows wrote it, or, for a
// multiple selection, the folder joined with each name. Null when memory runs out.
jobjectArray selectionToJava(JNIEnv* env, const OPENFILENAMEA& dialog);
