// The key handles libTessel_JNI hands to ADVAPI32 when it opens, creates or deletes a key,
// recorded through its import table (api_spy.h). On 64-bit Windows the predefined keys are
// 32-bit values sign-extended to pointer width; Wine looks only at their low 32 bits, so a
// zero-extended root works there and fails on Windows: only the handle itself shows it.
#pragma once

#include <windows.h>

#include <mutex>
#include <vector>

#include "api_spy.h"

namespace testkit::registry_spy {

struct Log {
    std::mutex mu;
    std::vector<HKEY> keys;  // the parent key of each open, create and delete, in order
};
inline Log recorded;

inline void record(HKEY key) {
    std::lock_guard<std::mutex> lock(recorded.mu);
    recorded.keys.push_back(key);
}

inline LONG WINAPI openKey(HKEY key, LPCSTR path, DWORD options, REGSAM access, PHKEY result) {
    record(key);
    return RegOpenKeyExA(key, path, options, access, result);
}
inline LONG WINAPI createKey(HKEY key, LPCSTR path, DWORD reserved, LPSTR keyClass, DWORD options,
                             REGSAM access, LPSECURITY_ATTRIBUTES security, PHKEY result,
                             LPDWORD disposition) {
    record(key);
    return RegCreateKeyExA(key, path, reserved, keyClass, options, access, security, result, disposition);
}
inline LONG WINAPI deleteKey(HKEY key, LPCSTR path) {
    record(key);
    return RegDeleteKeyA(key, path);
}

// Empties the log and points the library's imports at the spies; false when one is missing.
inline bool install(HMODULE library) {
    {
        std::lock_guard<std::mutex> lock(recorded.mu);
        recorded.keys.clear();
    }
    return patchImport(library, "RegOpenKeyExA", reinterpret_cast<void*>(openKey)) &&
           patchImport(library, "RegCreateKeyExA", reinterpret_cast<void*>(createKey)) &&
           patchImport(library, "RegDeleteKeyA", reinterpret_cast<void*>(deleteKey));
}

// The keys recorded since the last call, and the log emptied.
inline std::vector<HKEY> take() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    std::vector<HKEY> keys;
    keys.swap(recorded.keys);
    return keys;
}

}  // namespace testkit::registry_spy
