// nativeBrowseForFile and nativeBrowseForSaveFile: the open and save dialogs, the same in
// every step but the Windows function they call.
#include "choosers/file_dialogs.h"

#include <cstddef>
#include <cstring>
#include <memory>

#include "bridge/text_conversion.h"
#include "choosers/chooser_window.h"
#include "com_velmor_coreutil_hack_HackWindowsFileChooser.h"

namespace {

// The structure without the three trailing members (OPENFILENAME_SIZE_VERSION_400A), which
// every Windows version since 2000 accepts: 76 bytes on x86, the same fields at 64-bit width
// on x64.
constexpr DWORD kStructSize = offsetof(OPENFILENAMEA, lpTemplateName) + sizeof(LPCSTR);
#if defined(_WIN64)
static_assert(kStructSize == 136, "OPENFILENAMEA of 64-bit Windows, old version");
#else
static_assert(kStructSize == 76, "OPENFILENAMEA of 32-bit Windows, old version");
#endif

// Room for a long multiple selection; Windows fails the dialog when the names do not fit.
constexpr DWORD kFileBufferSize = 10000;

// OFN_FILEMUSTEXIST and OFN_ALLOWMULTISELECT hold for the save dialog too.
constexpr DWORD kDialogFlags =
    OFN_EXPLORER | OFN_FILEMUSTEXIST | OFN_PATHMUSTEXIST | OFN_ENABLEHOOK | OFN_HIDEREADONLY;
static_assert(kDialogFlags == 0x81824, "dialog flags");

using FileDialogFunction = BOOL(WINAPI*)(LPOPENFILENAMEA);

// The converted filter texts, one slot per array element; frees every text, then itself.
struct TextTableDeleter {
    jsize count;
    void operator()(char** texts) const {
        for (jsize i = 0; i < count; ++i) {
            std::free(texts[i]);
        }
        std::free(texts);
    }
};
using TextTable = std::unique_ptr<char*, TextTableDeleter>;

// Sets one element from native text; false when the Java string cannot be made.
bool setPathElement(JNIEnv* env, jobjectArray array, jsize index, const char* path) {
    jstring element = toJavaString(env, path);
    if (element == nullptr) {
        return false;
    }
    env->SetObjectArrayElement(array, index, element);
    return true;
}

jobjectArray runFileDialog(FileDialogFunction showDialog, JNIEnv* env, jobject self, jobjectArray filters,
                           jint filterIndex, jstring initialDirectory, jstring title,
                           jboolean multipleSelection) {
    // Declared in the reverse of the order they are freed in when the call ends.
    HeapBlock<char> fileBuffer;
    NativeText filterList;
    NativeText titleText;
    NativeText directoryText;

    OPENFILENAMEA dialog;
    ZeroMemory(&dialog, sizeof dialog);
    dialog.lStructSize = kStructSize;
    dialog.hwndOwner = nullptr;

    bool failed = false;
    filterList.reset(buildFilterList(env, filters, &failed));
    if (failed) {
        return nullptr;
    }
    dialog.lpstrFilter = filterList.get();
    dialog.nFilterIndex = static_cast<DWORD>(filterIndex);

    // Two zero bytes beyond what Windows may fill keep the last text terminated whatever
    // it writes.
    fileBuffer.reset(static_cast<char*>(std::calloc(kFileBufferSize + 2, 1)));
    if (!fileBuffer) {
        return nullptr;
    }
    dialog.lpstrFile = fileBuffer.get();
    dialog.nMaxFile = kFileBufferSize;

    if (initialDirectory != nullptr) {
        directoryText.reset(toNativeString(env, initialDirectory));
        if (!directoryText) {
            return nullptr;
        }
        dialog.lpstrInitialDir = directoryText.get();
    }
    if (title != nullptr) {
        titleText.reset(toNativeString(env, title));
        if (!titleText) {
            return nullptr;
        }
        dialog.lpstrTitle = titleText.get();
    }
    dialog.Flags = kDialogFlags | (multipleSelection ? OFN_ALLOWMULTISELECT : 0);

    ChooserContext context{env, self, false};
    dialog.lCustData = reinterpret_cast<LPARAM>(&context);
    dialog.lpfnHook = fileDialogHook;

    if (!showDialog(&dialog)) {
        return nullptr;  // cancel and failure alike
    }
    if (javaErrorPending(env)) {
        return nullptr;  // a failed lookup in the hook: Java sees its error, not a result
    }
    return selectionToJava(env, dialog);
}

}  // namespace

char* buildFilterList(JNIEnv* env, jobjectArray filters, bool* failed) {
    *failed = false;
    if (filters == nullptr) {
        return nullptr;  // as an empty array: no filter
    }
    const jsize count = env->GetArrayLength(filters);
    if (count < 1) {
        return nullptr;
    }
    TextTable texts(static_cast<char**>(std::calloc(static_cast<size_t>(count), sizeof(char*))),
                    TextTableDeleter{count});
    if (!texts) {
        *failed = true;
        return nullptr;
    }

    size_t textBytes = 0;
    for (jsize i = 0; i < count; ++i) {
        auto element = static_cast<jstring>(env->GetObjectArrayElement(filters, i));
        if (element == nullptr) {
            continue;  // adds neither text nor terminator
        }
        char* text = toNativeString(env, element);
        if (text == nullptr) {
            *failed = true;
            return nullptr;
        }
        texts.get()[i] = text;
        textBytes += std::strlen(text);
    }
    if (textBytes == 0) {
        return nullptr;
    }

    // Every text with its terminator, then at least four more zero bytes.
    char* list = static_cast<char*>(std::calloc(textBytes + static_cast<size_t>(count) + 4, 1));
    if (list == nullptr) {
        *failed = true;
        return nullptr;
    }
    size_t offset = 0;
    for (jsize i = 0; i < count; ++i) {
        const char* text = texts.get()[i];
        if (text == nullptr) {
            continue;
        }
        // An empty text becomes a lone NUL, which ends the list for Windows.
        const size_t length = std::strlen(text);
        std::memcpy(list + offset, text, length + 1);
        offset += length + 1;
    }
    return list;
}

UINT_PTR CALLBACK fileDialogHook(HWND, UINT message, WPARAM, LPARAM lParam) {
    if (message != WM_NOTIFY) {
        return 0;
    }
    const auto* notify = reinterpret_cast<const OFNOTIFYA*>(lParam);
    if (notify->hdr.code != static_cast<UINT>(CDN_INITDONE)) {
        return 0;
    }
    const auto* context = reinterpret_cast<const ChooserContext*>(notify->lpOFN->lCustData);
    // The notification comes from the dialog itself; the hook's own window is its child.
    HWND window = notify->hdr.hwndFrom;
    centerWindowAt(context->env, context->obj, kFileChooserClass, window);
    SetWindowPos(window, HWND_TOP, 0, 0, 0, 0, SWP_NOSIZE | SWP_NOMOVE);
    storeWindowHandle(context->env, context->obj, kFileChooserClass, window);
    return 0;
}

jobjectArray selectionToJava(JNIEnv* env, const OPENFILENAMEA& dialog) {
    // The texts Windows wrote, up to the first empty one, never read past the buffer.
    const char* buffer = dialog.lpstrFile;
    const char* end = buffer + dialog.nMaxFile;
    auto lengthOf = [end](const char* text) { return strnlen(text, static_cast<size_t>(end - text)); };
    jsize count = 0;
    for (const char* text = buffer; text < end && *text != '\0'; text += lengthOf(text) + 1) {
        ++count;
    }

    jclass stringClass = env->FindClass("java/lang/String");
    if (stringClass == nullptr) {
        return nullptr;
    }
    jobjectArray paths = env->NewObjectArray(count > 1 ? count - 1 : count, stringClass, nullptr);
    if (paths == nullptr || count == 0) {
        return paths;
    }
    if (count == 1) {
        return setPathElement(env, paths, 0, buffer) ? paths : nullptr;
    }

    // A folder, then names in it. Each joined path is built at its own length, so a long
    // folder with a long name comes back whole.
    const size_t folderLength = lengthOf(buffer);
    const char* name = buffer + folderLength + 1;
    for (jsize k = 1; k < count; ++k) {
        const size_t nameLength = lengthOf(name);
        NativeText joined(static_cast<char*>(std::calloc(folderLength + nameLength + 2, 1)));
        if (!joined) {
            return nullptr;
        }
        std::memcpy(joined.get(), buffer, folderLength);
        joined.get()[folderLength] = '\\';  // even after a drive root's own backslash
        std::memcpy(joined.get() + folderLength + 1, name, nameLength);
        if (!setPathElement(env, paths, k - 1, joined.get())) {
            return nullptr;
        }
        name += nameLength + 1;
    }
    return paths;
}

extern "C" {

jobjectArray JNICALL Java_com_velmor_coreutil_hack_HackWindowsFileChooser_nativeBrowseForFile(
    JNIEnv* env, jobject self, jobjectArray filters, jint filterIndex, jstring initialDirectory,
    jstring title, jboolean multipleSelection) {
    return runFileDialog(GetOpenFileNameA, env, self, filters, filterIndex, initialDirectory, title,
                         multipleSelection);
}

jobjectArray JNICALL Java_com_velmor_coreutil_hack_HackWindowsFileChooser_nativeBrowseForSaveFile(
    JNIEnv* env, jobject self, jobjectArray filters, jint filterIndex, jstring initialDirectory,
    jstring title, jboolean multipleSelection) {
    return runFileDialog(GetSaveFileNameA, env, self, filters, filterIndex, initialDirectory, title,
                         multipleSelection);
}

}  // extern "C"
