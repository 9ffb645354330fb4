#include "dialog_driver.h"

#include <commdlg.h>
#include <dlgs.h>
#include <commctrl.h>

#include <algorithm>
#include <cstring>
#include <vector>

namespace testkit {

bool isDialog(HWND window) {
    char name[16] = {};
    GetClassNameA(window, name, sizeof name);
    return std::strcmp(name, "#32770") == 0 && IsWindowVisible(window);
}

namespace {

BOOL CALLBACK takeDialog(HWND window, LPARAM out) {
    if (!isDialog(window)) {
        return TRUE;
    }
    *reinterpret_cast<HWND*>(out) = window;
    return FALSE;
}

struct TextSearch {
    std::string text;
    bool found;
};

BOOL CALLBACK matchText(HWND child, LPARAM parameter) {
    auto* search = reinterpret_cast<TextSearch*>(parameter);
    char buffer[256] = {};
    GetWindowTextA(child, buffer, sizeof buffer);
    search->found = search->found || search->text == buffer;
    return TRUE;
}

HWND treeOf(HWND dialog) {
    return FindWindowExA(dialog, nullptr, WC_TREEVIEWA, nullptr);
}

std::string itemText(HWND tree, HTREEITEM handle) {
    char text[MAX_PATH] = {};
    TVITEMA item{};
    item.mask = TVIF_TEXT;
    item.hItem = handle;
    item.pszText = text;
    item.cchTextMax = sizeof text;
    SendMessageA(tree, TVM_GETITEMA, 0, reinterpret_cast<LPARAM>(&item));
    return text;
}

}  // namespace

HWND dialogOfThread(DWORD thread) {
    HWND found = nullptr;
    EnumThreadWindows(thread, takeDialog, reinterpret_cast<LPARAM>(&found));
    return found;
}

HWND waitForDialog(const std::function<HWND()>& find) {
    for (DWORD waited = 0; waited < kDialogTimeoutMs; waited += 20) {
        HWND dialog = find();
        if (dialog != nullptr && isDialog(dialog)) {
            Sleep(300);  // let it paint before anyone looks at it
            return dialog;
        }
        Sleep(20);
    }
    return nullptr;
}

void press(HWND dialog, int button) {
    PostMessageA(dialog, WM_COMMAND, MAKEWPARAM(button, BN_CLICKED), 0);
}

void typeFileNameAndPressOk(HWND dialog, const char* typed) {
    SendMessageA(dialog, CDM_SETCONTROLTEXT, edt1, reinterpret_cast<LPARAM>(typed));
    press(dialog, IDOK);
}

bool showsText(HWND dialog, const std::string& text) {
    TextSearch search{text, false};
    EnumChildWindows(dialog, matchText, reinterpret_cast<LPARAM>(&search));
    return search.found;
}

HWND createTopLevel(bool visible, int x, int y, int width, int height) {
    return CreateWindowExA(0, "STATIC", "tessel test window", WS_POPUP | (visible ? WS_VISIBLE : 0), x, y,
                           width, height, nullptr, nullptr, GetModuleHandleA(nullptr), nullptr);
}

std::string treeSelection(HWND dialog) {
    HWND tree = treeOf(dialog);
    HTREEITEM caret = TreeView_GetSelection(tree);
    return caret != nullptr ? itemText(tree, caret) : std::string();
}

bool okEnabled(HWND dialog) {
    return IsWindowEnabled(GetDlgItem(dialog, IDOK)) != FALSE;
}

bool selectFolder(HWND dialog, const std::string& path) {
    // The items on the way, each found by a part of its text: "(C:)" in "Local Disk (C:)".
    std::vector<std::string> steps{"My Computer", "(" + path.substr(0, 2) + ")"};
    for (size_t start = 3; start < path.size();) {
        const size_t end = std::min(path.find('\\', start), path.size());
        steps.push_back(path.substr(start, end - start));
        start = end + 1;
    }
    HWND tree = treeOf(dialog);
    HTREEITEM item = TreeView_GetRoot(tree);
    for (const std::string& step : steps) {
        TreeView_Expand(tree, item, TVE_EXPAND);
        HTREEITEM child = TreeView_GetChild(tree, item);
        while (child != nullptr && itemText(tree, child).find(step) == std::string::npos) {
            child = TreeView_GetNextSibling(tree, child);
        }
        if (child == nullptr) {
            return false;
        }
        item = child;
    }
    return TreeView_SelectItem(tree, item) && treeSelection(dialog) == steps.back();
}

}  // namespace testkit
