// nativeBrowseForFolder and nativeSetStatus: the shell folder browser, owned by the
// process's first top-level window, with a Java validator behind its OK button.
#include "choosers/folder_browser.h"

#include <memory>

#include "bridge/shell_item_list.h"
#include "bridge/text_conversion.h"
#include "choosers/chooser_window.h"
#include "com_velmor_coreutil_hack_HackWindowsDirectoryChooser.h"

namespace {

#if defined(_WIN64)
static_assert(sizeof(BROWSEINFOA) == 64, "BROWSEINFOA of 64-bit Windows");
#else
static_assert(sizeof(BROWSEINFOA) == 32, "BROWSEINFOA of 32-bit Windows");
#endif

const char kValidatorInterface[] = "com/velmor/coreutil/hack/HackWindowsDirectoryValidator";
const char kValidatorSignature[] = "Lcom/velmor/coreutil/hack/HackWindowsDirectoryValidator;";

// A handle in "hwnd" outlives its dialog, and Windows may give it to another window,
// even one of another process; the status text goes only to a live window of ours.
bool isWindowOfThisProcess(HWND window) {
    DWORD owner = 0;
    return GetWindowThreadProcessId(window, &owner) != 0 && owner == GetCurrentProcessId();
}

}  // namespace

char* getStringFieldByName(JNIEnv* env, jobject obj, const char* className, const char* fieldName,
                           bool* failed) {
    *failed = false;
    jfieldID field = findFieldByName(env, className, fieldName, "Ljava/lang/String;");
    if (field == nullptr) {
        return nullptr;
    }
    auto value = static_cast<jstring>(env->GetObjectField(obj, field));
    if (value == nullptr) {
        return nullptr;
    }
    char* text = toNativeString(env, value);
    *failed = text == nullptr;
    return text;
}

int callValidator(JNIEnv* env, jobject validator, const char* path) {
    // Looked up on the interface, so any implementing class answers.
    jclass validatorInterface = env->FindClass(kValidatorInterface);
    if (validatorInterface == nullptr) {
        return 1;
    }
    jmethodID validate = env->GetMethodID(validatorInterface, "validateDirectory", "(Ljava/lang/String;)Z");
    if (validate == nullptr) {
        return 1;
    }
    jstring javaPath = toJavaString(env, path);
    if (javaPath == nullptr) {
        return -1;
    }
    const jboolean valid = env->CallBooleanMethod(validator, validate, javaPath);
    // After a throw the value returned is undefined: the validator said no, and its
    // exception stays pending for Java.
    if (javaErrorPending(env)) {
        return 0;
    }
    return valid ? 1 : 0;
}

bool onBrowseInitialized(JNIEnv* env, jobject obj, HWND dialog) {
    // First the handle, so that nativeSetStatus reaches the dialog from here on.
    storeWindowHandle(env, obj, kDirectoryChooserClass, dialog);
    centerWindowAt(env, obj, kDirectoryChooserClass, dialog);
    bool failed = false;
    NativeText start(getStringFieldByName(env, obj, kDirectoryChooserClass, "startpath", &failed));
    if (start) {
        // Sent even for a path that names no folder: the dialog decides what to do with it.
        SendMessageA(dialog, BFFM_SETSELECTIONA, TRUE, reinterpret_cast<LPARAM>(start.get()));
    }
    return !failed;
}

bool onSelectionChanged(JNIEnv* env, jobject obj, HWND dialog, LPCITEMIDLIST selection) {
    // Read at every change, so a validator Java replaces while the dialog is open counts
    // from the next selection on.
    jfieldID field = findFieldByName(env, kDirectoryChooserClass, "validator", kValidatorSignature);
    if (field == nullptr) {
        return true;
    }
    jobject validator = env->GetObjectField(obj, field);
    if (validator == nullptr) {
        return true;  // OK keeps the state the dialog gave it
    }
    char path[MAX_PATH] = {};
    if (!SHGetPathFromIDListA(selection, path)) {
        return true;  // no file-system path: nothing to ask about
    }
    const int ok = callValidator(env, validator, path);
    if (ok < 0) {
        return false;
    }
    SendMessageA(dialog, BFFM_ENABLEOK, 0, ok);
    return true;
}

int CALLBACK browseCallback(HWND dialog, UINT message, LPARAM lParam, LPARAM lpData) {
    auto* context = reinterpret_cast<ChooserContext*>(lpData);
    bool allocated = true;
    if (message == BFFM_INITIALIZED) {
        allocated = onBrowseInitialized(context->env, context->obj, dialog);
    } else if (message == BFFM_SELCHANGED) {
        // Nothing more is asked of Java once an error is pending: it reaches Java when the
        // dialog returns, and the OK button keeps its last state until then.
        if (!javaErrorPending(context->env)) {
            allocated = onSelectionChanged(context->env, context->obj, dialog,
                                           reinterpret_cast<LPCITEMIDLIST>(lParam));
        }
    }
    if (!allocated) {
        context->outOfMemory = true;
    }
    return 0;
}

extern "C" {

jstring JNICALL
Java_com_velmor_coreutil_hack_HackWindowsDirectoryChooser_nativeBrowseForFolder(JNIEnv* env, jobject self) {
    BROWSEINFOA browse;
    ZeroMemory(&browse, sizeof browse);
    browse.hwndOwner = findProcessWindow(GetCurrentProcessId());

    bool failed = false;
    NativeText title(getStringFieldByName(env, self, kDirectoryChooserClass, "title", &failed));
    if (failed) {
        return nullptr;  // out of memory: nothing shown
    }
    browse.lpszTitle = title.get();
    browse.ulFlags = static_cast<UINT>(getLongFieldByName(env, self, kDirectoryChooserClass, "browseFlags"));

    ChooserContext context{env, self, false};
    browse.lpfn = browseCallback;
    browse.lParam = reinterpret_cast<LPARAM>(&context);

    ItemList chosen(SHBrowseForFolderA(&browse));
    title.reset();
    if (!chosen) {
        return nullptr;  // cancel
    }
    if (context.outOfMemory) {
        // Too late to keep the dialog from showing; the choice made without the start path
        // or the validator's answer is not handed on.
        return nullptr;
    }
    char path[MAX_PATH] = {};
    if (!SHGetPathFromIDListA(chosen.get(), path)) {
        return nullptr;  // an item without a file-system path
    }
    if (javaErrorPending(env)) {
        return nullptr;  // Java sees the pending error instead of a result
    }
    return toJavaString(env, path);
}

void JNICALL Java_com_velmor_coreutil_hack_HackWindowsDirectoryChooser_nativeSetStatus(JNIEnv* env,
                                                                                       jobject self,
                                                                                       jstring status) {
    if (status == nullptr) {
        return;
    }
    HWND dialog = windowFromJava(getLongFieldByName(env, self, kDirectoryChooserClass, "hwnd"));
    if (dialog == nullptr || !isWindowOfThisProcess(dialog)) {
        return;  // no dialog yet, or the handle no longer names one of ours
    }
    NativeText text(toNativeString(env, status));
    if (!text) {
        return;
    }
    // From another thread this waits until the dialog's thread has shown the text.
    SendMessageA(dialog, BFFM_SETSTATUSTEXTA, 0, reinterpret_cast<LPARAM>(text.get()));
}

}  // extern "C"
