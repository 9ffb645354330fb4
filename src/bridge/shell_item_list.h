// A shell item list (ITEMIDLIST) owned by the code that received it from the shell.
#pragma once

#include <windows.h>
#include <shlobj.h>

#include <memory>

// Frees the list through the shell's allocator. When the allocator cannot be had, the list
// is left alone rather than freed by the wrong heap.
struct ItemListDeleter {
    void operator()(ITEMIDLIST* list) const {
        IMalloc* allocator = nullptr;
        if (SUCCEEDED(SHGetMalloc(&allocator))) {
            allocator->Free(list);
            allocator->Release();
        }
    }
};
using ItemList = std::unique_ptr<ITEMIDLIST, ItemListDeleter>;
