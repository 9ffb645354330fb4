// nativeGetRegistryValues on a key of 5,000 values, against a plain C loop making the same
// registry calls (enumerate the name, probe the size, read the data into a heap block), and
// against that loop filling the same Java table through JNI as a hand-written loop would.
// The second reference matters here: the JNI host is a strict checker, far slower per call
// than a JVM, and its Hashtable finds a key by a linear scan, so filling a table of 5,000
// entries costs the host about as much as all the registry calls.
// Rounds alternate between the three and the best round of each counts, so a busy moment
// of the machine or of wineserver weighs on none alone.
#include <windows.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <cstdlib>
#include <string>

#include "jnihost.h"

namespace {

const jint kCurrentUser = static_cast<jint>(0x80000001);
const int kValues = 5000;
const int kRounds = 15;

double now() {
    static LARGE_INTEGER frequency = [] {
        LARGE_INTEGER f;
        QueryPerformanceFrequency(&f);
        return f;
    }();
    LARGE_INTEGER t;
    QueryPerformanceCounter(&t);
    return static_cast<double>(t.QuadPart) / static_cast<double>(frequency.QuadPart);
}

// A third each of short strings, numbers and 16-byte blocks.
bool fillKey(const std::string& path) {
    HKEY key;
    if (RegCreateKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key,
                        nullptr) != ERROR_SUCCESS) {
        return false;
    }
    bool ok = true;
    for (int i = 0; i < kValues && ok; ++i) {
        const std::string name = "value" + std::to_string(i);
        LONG result;
        if (i % 3 == 0) {
            const std::string text = "text of value " + std::to_string(i);
            result = RegSetValueExA(key, name.c_str(), 0, REG_SZ, reinterpret_cast<const BYTE*>(text.c_str()),
                                    static_cast<DWORD>(text.size() + 1));
        } else if (i % 3 == 1) {
            const DWORD number = static_cast<DWORD>(i) * 2654435761u;
            result =
                RegSetValueExA(key, name.c_str(), 0, REG_DWORD, reinterpret_cast<const BYTE*>(&number), 4);
        } else {
            BYTE block[16];
            for (int b = 0; b < 16; ++b) {
                block[b] = static_cast<BYTE>(i + b);
            }
            result = RegSetValueExA(key, name.c_str(), 0, REG_BINARY, block, sizeof block);
        }
        ok = result == ERROR_SUCCESS;
    }
    RegCloseKey(key);
    return ok;
}

// What a table of the loop below is built with, looked up once as a hand-written loop would.
struct JavaTable {
    JNIEnv* env;
    jobject table;
    jmethodID put;
    jclass integerClass;
    jmethodID integerConstructor;
};

// Turns a value just read into the Java object the export would make and puts it in.
void putJava(const JavaTable& java, const char* name, DWORD type, const BYTE* data, DWORD size) {
    JNIEnv* env = java.env;
    jobject value = nullptr;
    if (type == REG_DWORD) {
        int32_t number;
        std::memcpy(&number, data, 4);
        value = env->NewObject(java.integerClass, java.integerConstructor, static_cast<jint>(number));
    } else if (type == REG_BINARY) {
        jbyteArray array = env->NewByteArray(static_cast<jsize>(size));
        env->SetByteArrayRegion(array, 0, static_cast<jsize>(size), reinterpret_cast<const jbyte*>(data));
        value = array;
    } else {
        WCHAR text[64];
        const int length = MultiByteToWideChar(CP_ACP, 0, reinterpret_cast<const char*>(data), -1, text, 64);
        value = env->NewString(reinterpret_cast<const jchar*>(text), length > 0 ? length - 1 : 0);
    }
    WCHAR wideName[256];
    const int length = MultiByteToWideChar(CP_ACP, 0, name, -1, wideName, 256);
    jstring javaName = env->NewString(reinterpret_cast<const jchar*>(wideName), length > 0 ? length - 1 : 0);
    env->CallObjectMethod(java.table, java.put, javaName, value);
}

// The same registry calls as the export (enumerate the name, probe the size, read the data
// into a heap block), in plain C; with a table, each value also goes into it through JNI.
// Returns the number of values read.
int plainLoop(const std::string& path, const JavaTable* java) {
    HKEY key;
    if (RegOpenKeyExA(HKEY_CURRENT_USER, path.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) {
        return -1;
    }
    int count = 0;
    char name[256];
    for (DWORD index = 0;; ++index) {
        DWORD capacity = sizeof name;
        if (RegEnumValueA(key, index, name, &capacity, nullptr, nullptr, nullptr, nullptr) != ERROR_SUCCESS) {
            break;
        }
        DWORD type = 0;
        DWORD size = 0;
        if (RegQueryValueExA(key, name, nullptr, &type, nullptr, &size) != ERROR_SUCCESS) {
            break;
        }
        BYTE* buffer = static_cast<BYTE*>(std::malloc(size + 1));
        if (buffer == nullptr ||
            RegQueryValueExA(key, name, nullptr, &type, buffer, &size) != ERROR_SUCCESS) {
            std::free(buffer);
            break;
        }
        buffer[size] = 0;
        if (java != nullptr) {
            putJava(*java, name, type, buffer, size);
        }
        std::free(buffer);
        ++count;
    }
    RegCloseKey(key);
    return count;
}

// The loop with its table, in a fresh host like the export.
int plainLoopWithJava(const std::string& path, double* seconds) {
    jnihost::Vm vm;
    JNIEnv* env = vm.env();
    const double start = now();
    jclass tableClass = env->FindClass("java/util/Hashtable");
    JavaTable java{
        env, env->NewObject(tableClass, env->GetMethodID(tableClass, "<init>", "()V")),
        env->GetMethodID(tableClass, "put", "(Ljava/lang/Object;Ljava/lang/Object;)Ljava/lang/Object;"),
        env->FindClass("java/lang/Integer"), nullptr};
    java.integerConstructor = env->GetMethodID(java.integerClass, "<init>", "(I)V");
    const int count = plainLoop(path, &java);
    *seconds = now() - start;
    return count == static_cast<int>(vm.hashtableEntries(java.table).size()) ? count : -1;
}

// One call of the export in a fresh host, so objects of earlier rounds weigh on none.
int exportCall(const std::string& path, double* seconds) {
    jnihost::Vm vm;
    jnihost::Library lib(vm);
    jstring keyPath = vm.newStringUtf8(path);
    const double start = now();
    jobject table = lib.call<jobject>("_Java_com_velmor_coreutil_io_WinRegistry_nativeGetRegistryValues@16",
                                      jclass{}, kCurrentUser, keyPath);
    *seconds = now() - start;
    if (table == nullptr || !vm.violations().empty()) {
        return -1;
    }
    return static_cast<int>(vm.hashtableEntries(table).size());
}

}  // namespace

int main() {
    const std::string path = "Software\\TesselBench\\Registry-" + std::to_string(GetCurrentProcessId());
    if (!fillKey(path)) {
        std::fprintf(stderr, "cannot fill HKEY_CURRENT_USER\\%s\n", path.c_str());
        RegDeleteTreeA(HKEY_CURRENT_USER, path.c_str());
        return 1;
    }

    double bestPlain = 1e9;
    double bestPlainJava = 1e9;
    double bestExport = 1e9;
    bool ok = true;
    for (int round = 0; round < kRounds && ok; ++round) {
        double seconds = now();
        ok = plainLoop(path, nullptr) == kValues;
        bestPlain = std::min(bestPlain, now() - seconds);
        ok = ok && plainLoopWithJava(path, &seconds) == kValues;
        bestPlainJava = std::min(bestPlainJava, seconds);
        ok = ok && exportCall(path, &seconds) == kValues;
        bestExport = std::min(bestExport, seconds);
    }
    RegDeleteTreeA(HKEY_CURRENT_USER, path.c_str());
    RegDeleteKeyA(HKEY_CURRENT_USER, "Software\\TesselBench");
    if (!ok) {
        std::fprintf(stderr, "a round did not read all %d values\n", kValues);
        return 1;
    }

    std::printf("nativeGetRegistryValues, key of %d values (best of %d rounds)\n", kValues, kRounds);
    std::printf("  plain C loop, registry calls only:     %8.2f ms\n", bestPlain * 1e3);
    std::printf("  the same loop filling the Java table:  %8.2f ms\n", bestPlainJava * 1e3);
    std::printf("  nativeGetRegistryValues:               %8.2f ms\n", bestExport * 1e3);
    std::printf("  ratio to the registry-only loop:       %8.3f  (%+.1f%%)\n", bestExport / bestPlain,
                (bestExport / bestPlain - 1) * 100);
    std::printf("  ratio to the loop with the same table: %8.3f  (%+.1f%%)\n", bestExport / bestPlainJava,
                (bestExport / bestPlainJava - 1) * 100);
    return 0;
}
