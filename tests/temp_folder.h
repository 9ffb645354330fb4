// A fresh folder under the Windows temp folder for one test, removed with its contents
// afterwards; paths as UTF-8 (what the Velzip family hands over) and as UTF-16.
#pragma once

#include <windows.h>

#include <atomic>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

namespace testfs {

inline std::wstring wide(const std::string& utf8) {
    const int n = MultiByteToWideChar(CP_UTF8, 0, utf8.c_str(), -1, nullptr, 0);
    std::wstring w(n > 0 ? n - 1 : 0, L'\0');
    if (n > 1) {
        MultiByteToWideChar(CP_UTF8, 0, utf8.c_str(), -1, &w[0], n);
    }
    return w;
}

inline std::string utf8(const std::wstring& w) {
    const int n = WideCharToMultiByte(CP_UTF8, 0, w.c_str(), -1, nullptr, 0, nullptr, nullptr);
    std::string s(n > 0 ? n - 1 : 0, '\0');
    if (n > 1) {
        WideCharToMultiByte(CP_UTF8, 0, w.c_str(), -1, &s[0], n, nullptr, nullptr);
    }
    return s;
}

inline void removeTree(const std::wstring& path) {
    WIN32_FIND_DATAW data;
    HANDLE find = FindFirstFileW((path + L"\\*").c_str(), &data);
    if (find != INVALID_HANDLE_VALUE) {
        do {
            const std::wstring name = data.cFileName;
            if (name == L"." || name == L"..") {
                continue;
            }
            const std::wstring child = path + L"\\" + name;
            if (data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) {
                removeTree(child);
            } else {
                SetFileAttributesW(child.c_str(), FILE_ATTRIBUTE_NORMAL);
                DeleteFileW(child.c_str());
            }
        } while (FindNextFileW(find, &data));
        FindClose(find);
    }
    RemoveDirectoryW(path.c_str());
}

class TempFolder {
public:
    TempFolder() {
        static std::atomic<int> counter{0};
        wchar_t base[MAX_PATH + 1];
        const DWORD n = GetTempPathW(MAX_PATH + 1, base);
        std::wstring root(base, n);
        if (!root.empty() && root.back() != L'\\') {
            root += L'\\';
        }
        path_ =
            root + L"tessel-" + std::to_wstring(GetCurrentProcessId()) + L"-" + std::to_wstring(++counter);
        removeTree(path_);
        CreateDirectoryW(path_.c_str(), nullptr);
    }
    ~TempFolder() { removeTree(path_); }
    TempFolder(const TempFolder&) = delete;
    TempFolder& operator=(const TempFolder&) = delete;

    const std::wstring& wpath() const { return path_; }
    std::string path() const { return utf8(path_); }
    // A child path, name given as UTF-8.
    std::string file(const std::string& name) const { return path() + "\\" + name; }
    std::wstring wfile(const std::string& name) const { return path_ + L"\\" + wide(name); }

private:
    std::wstring path_;
};

inline bool exists(const std::wstring& path) {
    return GetFileAttributesW(path.c_str()) != INVALID_FILE_ATTRIBUTES;
}

inline std::vector<unsigned char> readAll(const std::wstring& path) {
    std::vector<unsigned char> bytes;
    HANDLE h = CreateFileW(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                           OPEN_EXISTING, 0, nullptr);
    if (h == INVALID_HANDLE_VALUE) {
        return bytes;
    }
    unsigned char chunk[65536];
    DWORD got = 0;
    while (ReadFile(h, chunk, sizeof chunk, &got, nullptr) && got > 0) {
        bytes.insert(bytes.end(), chunk, chunk + got);
    }
    CloseHandle(h);
    return bytes;
}

inline bool writeAll(const std::wstring& path, const std::vector<unsigned char>& bytes) {
    HANDLE h = CreateFileW(path.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr);
    if (h == INVALID_HANDLE_VALUE) {
        return false;
    }
    DWORD done = 0;
    const bool ok =
        bytes.empty() || (WriteFile(h, bytes.data(), static_cast<DWORD>(bytes.size()), &done, nullptr) &&
                          done == bytes.size());
    CloseHandle(h);
    return ok;
}

// Bytes of varied content: text lines when `text`, else pseudo-random bytes.
inline std::vector<unsigned char> sampleData(size_t size, bool text, uint32_t seed = 12345) {
    std::vector<unsigned char> out;
    out.reserve(size);
    uint32_t x = seed;
    auto next = [&x] {
        x ^= x << 13;
        x ^= x >> 17;
        x ^= x << 5;
        return x;
    };
    static const char* words[] = {"velzip", "stream", "header", "zlib", "tessel", "line", "block", "data"};
    while (out.size() < size) {
        if (text) {
            const char* w = words[next() % 8];
            for (const char* p = w; *p && out.size() < size; ++p) {
                out.push_back(static_cast<unsigned char>(*p));
            }
            if (out.size() < size) {
                out.push_back(next() % 9 == 0 ? '\n' : ' ');
            }
        } else {
            out.push_back(static_cast<unsigned char>(next() >> 24));
        }
    }
    return out;
}

// A buffer whose last byte sits right before an inaccessible page, so a read past it faults.
class GuardedBuffer {
public:
    explicit GuardedBuffer(const std::vector<unsigned char>& bytes) {
        SYSTEM_INFO info;
        GetSystemInfo(&info);
        const size_t page = info.dwPageSize;
        const size_t dataPages = (bytes.size() + page - 1) / page + 1;
        base_ = static_cast<unsigned char*>(
            VirtualAlloc(nullptr, (dataPages + 1) * page, MEM_RESERVE | MEM_COMMIT, PAGE_READWRITE));
        DWORD old;
        VirtualProtect(base_ + dataPages * page, page, PAGE_NOACCESS, &old);
        data_ = base_ + dataPages * page - bytes.size();
        if (!bytes.empty()) {
            std::memcpy(data_, bytes.data(), bytes.size());
        }
    }
    ~GuardedBuffer() { VirtualFree(base_, 0, MEM_RELEASE); }
    GuardedBuffer(const GuardedBuffer&) = delete;
    GuardedBuffer& operator=(const GuardedBuffer&) = delete;
    unsigned char* data() const { return data_; }

private:
    unsigned char* base_ = nullptr;
    unsigned char* data_ = nullptr;
};

}  // namespace testfs
