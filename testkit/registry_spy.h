// What libTessel_JNI hands to ADVAPI32 when it opens and closes registry keys, recorded
// through its import table (api_spy.h): the parent key and access each RegOpenKeyExA and
// RegCreateKeyExA is given, and which of the keys it got are still open. The real functions
// do the work, so the registry changes as it would without the spy. On 64-bit Windows the
// predefined keys are 32-bit values sign-extended to pointer width; Wine looks only at their
// low 32 bits, so only the parent handle recorded here shows a zero-extended root.
//
// Header-only, like the chooser spies: only the registry tests use it.
#pragma once

#include <windows.h>

#include <mutex>
#include <set>
#include <string>
#include <vector>

#include "api_spy.h"

namespace testkit::registry_spy {

// One open or create: the path below its parent (a root or a key opened before) and the access.
struct KeyOpen {
    HKEY parent;
    bool created;
    std::string subKey;
    REGSAM access;
    LONG result;
};

struct Log {
    std::mutex mu;
    std::vector<KeyOpen> opens;
    std::set<HKEY> openKeys;  // handed to the library and not closed yet
    int strayCloses = 0;      // RegCloseKey of a key the library did not get from the two calls
};
inline Log recorded;

inline LONG record(HKEY parent, bool created, const char* subKey, REGSAM access, LONG result, HKEY key) {
    std::lock_guard<std::mutex> lock(recorded.mu);
    recorded.opens.push_back({parent, created, subKey != nullptr ? subKey : "<null>", access, result});
    if (result == ERROR_SUCCESS) {
        recorded.openKeys.insert(key);
    }
    return result;
}

inline LONG WINAPI openKey(HKEY parent, LPCSTR subKey, DWORD options, REGSAM access, PHKEY key) {
    const LONG result = RegOpenKeyExA(parent, subKey, options, access, key);
    return record(parent, false, subKey, access, result, result == ERROR_SUCCESS ? *key : nullptr);
}
inline LONG WINAPI createKey(HKEY parent, LPCSTR subKey, DWORD reserved, LPSTR keyClass, DWORD options,
                             REGSAM access, LPSECURITY_ATTRIBUTES security, PHKEY key, LPDWORD disposition) {
    const LONG result =
        RegCreateKeyExA(parent, subKey, reserved, keyClass, options, access, security, key, disposition);
    return record(parent, true, subKey, access, result, result == ERROR_SUCCESS ? *key : nullptr);
}
inline LONG WINAPI closeKey(HKEY key) {
    {
        std::lock_guard<std::mutex> lock(recorded.mu);
        if (recorded.openKeys.erase(key) == 0) {
            ++recorded.strayCloses;
        }
    }
    return RegCloseKey(key);
}

// Empties the log.
inline void clear() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    recorded.opens.clear();
    recorded.openKeys.clear();
    recorded.strayCloses = 0;
}

// Empties the log and points the library's imports at the spies; false when one of the
// three imports is missing.
inline bool install(HMODULE library) {
    clear();
    return patchImport(library, "RegOpenKeyExA", reinterpret_cast<void*>(openKey)) &&
           patchImport(library, "RegCreateKeyExA", reinterpret_cast<void*>(createKey)) &&
           patchImport(library, "RegCloseKey", reinterpret_cast<void*>(closeKey));
}

// Copies of the log, taken under its lock.
inline std::vector<KeyOpen> opens() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    return recorded.opens;
}
inline size_t openKeys() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    return recorded.openKeys.size();
}
inline int strayCloses() {
    std::lock_guard<std::mutex> lock(recorded.mu);
    return recorded.strayCloses;
}

}  // namespace testkit::registry_spy
