// The registry as the WinRegistry tests, the fuzz driver and the soak see it past the
// library: the export names, readers and writers that go straight to ADVAPI32 (to check what
// the library really stored and to plant data it could never write itself), and a key of a
// run's own that removes itself.
//
// ScopedTestKey: a key of one test's (or run's) own below HKEY_CURRENT_USER\Software,
// removed with its whole tree at the end (HKCU persists in the Wine prefix, so a leftover
// would leak into the next run).
#pragma once

#include <windows.h>

#include <jni.h>

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace regkit {

using Bytes = std::vector<uint8_t>;

// The six WinRegistry exports (stdcall, argument bytes after the @).
#define REGKIT_WR "_Java_com_velmor_coreutil_io_WinRegistry_"
constexpr char kGetValue[] = REGKIT_WR "nativeGetRegistryValue@20";
constexpr char kGetValues[] = REGKIT_WR "nativeGetRegistryValues@16";
constexpr char kSetValue[] = REGKIT_WR "nativeSetRegistryValue@24";
constexpr char kSetValues[] = REGKIT_WR "nativeSetRegistryValues@20";
constexpr char kDeleteValue[] = REGKIT_WR "nativeDeleteRegistryValue@20";
constexpr char kDeleteKey[] = REGKIT_WR "nativeDeleteRegistryKey@20";
#undef REGKIT_WR

inline const jint kCurrentUser = static_cast<jint>(0x80000001);
// A root handle value that is no predefined key: every open or create under it fails.
inline const jint kNoSuchRoot = static_cast<jint>(0x12345678);

// A value as Windows holds it. result is ERROR_FILE_NOT_FOUND when the key is missing.
struct RawValue {
    LONG result = ERROR_FILE_NOT_FOUND;
    DWORD type = REG_NONE;
    Bytes data;
};

inline RawValue rawValue(const std::string& path, const char* name, HKEY root = HKEY_CURRENT_USER) {
    RawValue raw;
    HKEY key;
    if (RegOpenKeyExA(root, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return raw;
    }
    DWORD size = 0;
    raw.result = RegQueryValueExA(key, name, nullptr, &raw.type, nullptr, &size);
    if (raw.result == ERROR_SUCCESS) {
        raw.data.resize(size);
        raw.result = RegQueryValueExA(key, name, nullptr, &raw.type, raw.data.data(), &size);
        raw.data.resize(raw.result == ERROR_SUCCESS ? size : 0);
    }
    RegCloseKey(key);
    return raw;
}

// Every value of a key in the order RegEnumValueA lists them (Wine: alphabetical), names of
// any length; empty when the key does not open.
inline std::vector<std::pair<std::string, RawValue>> rawValues(const std::string& path, HKEY root) {
    std::vector<std::pair<std::string, RawValue>> values;
    HKEY key;
    if (RegOpenKeyExA(root, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return values;
    }
    std::vector<char> name(32768);
    for (DWORD i = 0;; ++i) {
        DWORD capacity = static_cast<DWORD>(name.size());
        RawValue raw;
        DWORD size = 0;
        if (RegEnumValueA(key, i, name.data(), &capacity, nullptr, &raw.type, nullptr, &size) !=
            ERROR_SUCCESS) {
            break;
        }
        raw.data.resize(size);
        DWORD nameCapacity = static_cast<DWORD>(name.size());
        raw.result =
            RegEnumValueA(key, i, name.data(), &nameCapacity, nullptr, &raw.type, raw.data.data(), &size);
        raw.data.resize(raw.result == ERROR_SUCCESS ? size : 0);
        values.emplace_back(std::string(name.data(), capacity), raw);
    }
    RegCloseKey(key);
    return values;
}

// What the key delete sees of a key: whether it opens, and its sub-keys and values.
struct KeyCounts {
    bool opens = false;
    DWORD subKeys = 0;
    DWORD values = 0;
};

inline KeyCounts keyCounts(const std::string& path, HKEY root) {
    KeyCounts counts;
    HKEY key;
    if (RegOpenKeyExA(root, path.c_str(), 0, KEY_QUERY_VALUE | KEY_ENUMERATE_SUB_KEYS, &key) !=
        ERROR_SUCCESS) {
        return counts;
    }
    counts.opens = RegQueryInfoKeyA(key, nullptr, nullptr, nullptr, &counts.subKeys, nullptr, nullptr,
                                    &counts.values, nullptr, nullptr, nullptr, nullptr) == ERROR_SUCCESS;
    RegCloseKey(key);
    return counts;
}

// Creates the key with any missing keys above it and, given a name, sets that value to
// exactly `size` bytes of `data` (which need not fit the type). False on any failure.
inline bool setRawValue(const std::string& path, const char* name = nullptr, DWORD type = REG_NONE,
                        const void* data = nullptr, DWORD size = 0) {
    HKEY key;
    if (RegCreateKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key,
                        nullptr) != ERROR_SUCCESS) {
        return false;
    }
    const bool ok = name == nullptr ||
                    RegSetValueExA(key, name, 0, type, static_cast<const BYTE*>(data), size) == ERROR_SUCCESS;
    RegCloseKey(key);
    return ok;
}

// The number of sub-keys of a key; -1 when the key does not exist.
inline int subKeys(const std::string& path) {
    HKEY key;
    DWORD count = 0;
    if (RegOpenKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return -1;
    }
    RegQueryInfoKeyA(key, nullptr, nullptr, nullptr, &count, nullptr, nullptr, nullptr, nullptr, nullptr,
                     nullptr, nullptr);
    RegCloseKey(key);
    return static_cast<int>(count);
}

inline bool keyExists(const std::string& path) {
    return subKeys(path) >= 0;
}

// The value names of a key in the order RegEnumValueA lists them (Wine: alphabetical).
inline std::vector<std::string> valueNames(const std::string& path) {
    std::vector<std::string> names;
    HKEY key;
    if (RegOpenKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return names;
    }
    char name[16384];
    for (DWORD i = 0;; ++i) {
        DWORD capacity = sizeof name;
        if (RegEnumValueA(key, i, name, &capacity, nullptr, nullptr, nullptr, nullptr) != ERROR_SUCCESS) {
            break;
        }
        names.emplace_back(name, capacity);
    }
    RegCloseKey(key);
    return names;
}

// A tree below `root`: `depth` levels of `width` keys each, named k0, k1, ...; with
// `values`, every key above the leaves also holds a DWORD value "v". Returns the leaves.
inline std::vector<std::string> makeTree(const std::string& root, int depth, int width, bool values) {
    std::vector<std::string> level{root};
    for (int d = 0; d < depth; ++d) {
        std::vector<std::string> next;
        for (const std::string& parent : level) {
            if (values) {
                setRawValue(parent, "v", REG_DWORD, "\1\0\0\0", 4);
            }
            for (int k = 0; k < width; ++k) {
                next.push_back(parent + "\\k" + std::to_string(k));
            }
        }
        level = std::move(next);
    }
    for (const std::string& leaf : level) {
        setRawValue(leaf);
    }
    return level;
}

// HKCU\Software\TesselRegistryTests\<name>-<process id>, absent when made and removed with
// its tree when destroyed; the common parent goes too once no other run's key is left. The
// process id keeps apart the test programs that ctest runs side by side.
class ScopedTestKey {
public:
    explicit ScopedTestKey(const std::string& name)
        : path_(std::string(kRoot) + "\\" + name + "-" + std::to_string(GetCurrentProcessId())) {
        RegDeleteTreeA(HKEY_CURRENT_USER, path_.c_str());  // left by a run that crashed
    }
    ~ScopedTestKey() {
        RegDeleteTreeA(HKEY_CURRENT_USER, path_.c_str());
        RegDeleteKeyA(HKEY_CURRENT_USER, kRoot);  // fails while another run's key is there
    }
    ScopedTestKey(const ScopedTestKey&) = delete;
    ScopedTestKey& operator=(const ScopedTestKey&) = delete;

    const std::string& path() const { return path_; }

private:
    static constexpr const char* kRoot = "Software\\TesselRegistryTests";
    std::string path_;
};

}  // namespace regkit
