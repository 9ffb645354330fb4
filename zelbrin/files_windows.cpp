// Files through the wide-character Windows API, so names outside the ANSI code page work.
#include "internal.h"

#include <algorithm>

namespace Zel {

// A path too long to copy counts as one that cannot be decoded: no exception leaves the DLL.
NativePath::NativePath(const char* path) noexcept {
    try {
        std::u16string units;
        ok = decodeUtf8(path, units);
        text.assign(units.begin(), units.end());
    } catch (const std::bad_alloc&) {
        ok = false;
    }
}

bool osExists(const NativePath& p) {
    return GetFileAttributesW(p.c_str()) != INVALID_FILE_ATTRIBUTES;
}

bool osIsFolder(const NativePath& p) {
    const DWORD a = GetFileAttributesW(p.c_str());
    return a != INVALID_FILE_ATTRIBUTES && (a & FILE_ATTRIBUTE_DIRECTORY);
}

bool osCanRead(const NativePath& p) {
    if (!osExists(p) || osIsFolder(p)) {
        return false;
    }
    HANDLE h = CreateFileW(p.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                           OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
    if (h == INVALID_HANDLE_VALUE) {
        return false;
    }
    CloseHandle(h);
    return true;
}

bool osCanWrite(const NativePath& p) {
    if (osExists(p)) {
        if (osIsFolder(p)) {
            return false;
        }
        HANDLE h =
            CreateFileW(p.c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE,
                        nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
        if (h == INVALID_HANDLE_VALUE) {
            return false;
        }
        CloseHandle(h);
        return true;
    }
    // A new file: create it and let the system delete it again. Fails when the folder is
    // missing or refuses new files.
    HANDLE h = CreateFileW(p.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_NEW,
                           FILE_ATTRIBUTE_TEMPORARY | FILE_FLAG_DELETE_ON_CLOSE, nullptr);
    if (h == INVALID_HANDLE_VALUE) {
        return false;
    }
    CloseHandle(h);
    return true;
}

OsFile osOpenRead(const NativePath& p) {
    return CreateFileW(p.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                       FILE_ATTRIBUTE_NORMAL | FILE_FLAG_SEQUENTIAL_SCAN, nullptr);
}

// Readers may share the file while it is written; another writer may not.
OsFile osOpenWrite(const NativePath& p) {
    return CreateFileW(p.c_str(), GENERIC_WRITE, FILE_SHARE_READ, nullptr, CREATE_ALWAYS,
                       FILE_ATTRIBUTE_NORMAL, nullptr);
}

long long osSize(OsFile f) {
    LARGE_INTEGER size;
    return GetFileSizeEx(f, &size) ? size.QuadPart : -1;
}

// Bytes read (0 at the end), or -1.
long osRead(OsFile f, unsigned char* buffer, size_t count) {
    DWORD got = 0;
    if (!ReadFile(f, buffer, static_cast<DWORD>(count), &got, nullptr)) {
        return -1;
    }
    return static_cast<long>(got);
}

bool osWriteAll(OsFile f, const unsigned char* data, size_t count) {
    while (count > 0) {
        DWORD done = 0;
        if (!WriteFile(f, data, static_cast<DWORD>(std::min<size_t>(count, 1u << 30)), &done, nullptr) ||
            done == 0) {
            return false;
        }
        data += done;
        count -= done;
    }
    return true;
}

bool osRewind(OsFile f) {
    return SetFilePointer(f, 0, nullptr, FILE_BEGIN) != INVALID_SET_FILE_POINTER;
}

bool osClose(OsFile f) {
    return CloseHandle(f) != 0;
}

}  // namespace Zel
