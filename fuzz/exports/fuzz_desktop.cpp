// The CoreNativeNT family under fuzz: environment variables with adversarial names and
// values (defined by the driver through the wide API, so the value's conversion to the ANSI
// code page is seen), shell folder ids of every kind, and cursor moves to odd points.
#include <windows.h>
#include <shlobj.h>

#include <climits>

#include "desktop_client.h"
#include "fuzz_case.h"
#include "fuzz_run.h"

namespace fuzz {

namespace {

using namespace testkit::desktop;

// Wine's own GetEnvironmentVariableA crashes for names of this many bytes, with no library
// of ours involved; such names are skipped and counted.
bool wineCrashesOnName(size_t bytes) {
    return bytes >= 32767 && bytes <= 65535;
}

struct Variable {
    std::u16string name;
    std::u16string value;
};

// Names all start with TFZ so they meet no variable of the environment.
std::u16string variableName(Case& c) {
    std::u16string name = u"TFZ" + plainText(c.rng, c.rng.range(1, 8));
    if (c.rng.chance(20)) {
        name += u"\u00e9\u00df";  // Latin-1: the same in the ANSI code page
    }
    return name;
}

void opEnvironment(Case& c, Run& run, std::vector<Variable>& defined) {
    if (defined.empty() || c.rng.chance(25)) {
        Variable v{variableName(c), anyText(c.rng).substr(0, c.rng.chance(10) ? 32000 : 2000)};
        v.value = v.value.substr(0, v.value.find(u'\0'));
        if (v.value.empty()) {
            v.value = u"x";
        }
        if (SetEnvironmentVariableW(reinterpret_cast<LPCWSTR>(v.name.c_str()),
                                    reinterpret_cast<LPCWSTR>(v.value.c_str()))) {
            defined.push_back(v);
        }
    }
    std::u16string name;
    bool null = false;
    switch (defined.empty() ? 1 + c.rng.below(4) % 2 * 3 : c.rng.below(8)) {
        case 0:
            null = true;
            break;
        case 1:
            name = u"TFZ" + anyText(c.rng);  // long, odd, with NULs
            break;
        case 2:
            name = c.rng.pick(defined).name + std::u16string(u"\0", 1) + anyText(c.rng);  // cut at the NUL
            break;
        case 3:
            name = upperCase(c.rng.pick(defined).name);  // names ignore case
            break;
        case 4:
            name = c.rng.chance(50) ? u"" : u"TFZ=" + plainText(c.rng, 3);
            break;
        default:
            name = c.rng.pick(defined).name;
    }
    const std::string ansi = cutAtNul(ansiBytes(name));
    if (!null && wineCrashesOnName(ansi.size())) {
        ++run.envNamesSkipped;
        return;
    }
    const std::u16string key = upperCase(fromAnsi(ansi));
    const Variable* match = nullptr;
    for (const Variable& v : defined) {
        if (!null && upperCase(v.name) == key) {
            match = &v;
        }
    }
    jstring got = c.call<jstring>(kGetEnv, null ? jstring{} : c.vm.newString(name));
    const std::u16string want = match ? ansiRoundTrip(match->value) : u"";
    c.expect(match ? got != nullptr && c.vm.stringValue(got) == want : got == nullptr, [&] {
        return "getEnvVariable(" + (null ? std::string("null") : show(name)) + ") gave " +
               (got ? show(c.vm.stringValue(got)) : "null") + ", expected " + (match ? show(want) : "null");
    });
}

// The path the shell gives for a folder id, as the ANSI text the library converts; false
// when it gives none.
bool shellPath(int id, std::string* path) {
    ITEMIDLIST* list = nullptr;
    if (FAILED(SHGetSpecialFolderLocation(nullptr, id, &list)) || list == nullptr) {
        return false;
    }
    char buffer[MAX_PATH] = {};
    const bool found = SHGetPathFromIDListA(list, buffer);
    CoTaskMemFree(list);
    *path = buffer;
    return found;
}

void opSpecialFolder(Case& c) {
    jint id;
    switch (c.rng.below(4)) {
        case 0:
            id = static_cast<jint>(c.rng.next());
            break;
        case 1:
            id = c.rng.chance(50) ? INT_MIN : -static_cast<jint>(c.rng.below(300));
            break;
        default:
            id = static_cast<jint>(c.rng.below(0x40));
    }
    std::string path;
    const bool found = shellPath(id, &path);
    jstring got = c.call<jstring>(kSpecialFolder, id);
    const std::u16string want = fromAnsi(path);
    c.expect(found ? got != nullptr && c.vm.stringValue(got) == want : got == nullptr, [&] {
        return "getSpecialFolderLocation(" + std::to_string(id) + ") gave " +
               (got ? show(c.vm.stringValue(got)) : "null") + ", expected " + (found ? show(want) : "null");
    });
}

void opCursor(Case& c) {
    const bool onScreen = c.rng.chance(70);
    const int w = GetSystemMetrics(SM_CXSCREEN), h = GetSystemMetrics(SM_CYSCREEN);
    const jint x = onScreen ? static_cast<jint>(c.rng.below(w)) : static_cast<jint>(c.rng.next());
    const jint y = onScreen ? static_cast<jint>(c.rng.below(h)) : static_cast<jint>(c.rng.next());
    const bool null = c.rng.chance(5);
    const bool moved =
        c.call<jboolean>(kSetCursorPos, null ? jobject{} : c.vm.newPoint(x, y, c.rng.chance(30))) == JNI_TRUE;
    c.expect(!null || !moved, [] { return "setCursorPos(null) gave true"; });
    c.expect(null || !onScreen || moved,
             [&] { return "setCursorPos(" + std::to_string(x) + ", " + std::to_string(y) + ") gave false"; });
    jobject point = c.call<jobject>(kGetCursorPos);
    c.expect(point != nullptr, [] { return "getCursorPos gave null"; });
    if (point == nullptr) {
        return;
    }
    const auto [px, py] = c.vm.pointValue(point);
    c.expect(null || !onScreen ? px >= 0 && px < w && py >= 0 && py < h : px == x && py == y, [&] {
        return "getCursorPos gave (" + std::to_string(px) + ", " + std::to_string(py) +
               ") after a move to (" + std::to_string(x) + ", " + std::to_string(y) + ")";
    });
}

}  // namespace

void fuzzDesktop(Case& c, Run& run) {
    c.family = "desktop";
    std::vector<Variable> defined;
    const int steps = static_cast<int>(c.rng.range(1, 20));
    for (int i = 0; i < steps && c.failures.empty(); ++i) {
        const uint32_t op = c.rng.below(10);
        if (op < 5) {
            opEnvironment(c, run, defined);
        } else if (op < 8) {
            opSpecialFolder(c);
        } else {
            opCursor(c);
        }
    }
    for (const Variable& v : defined) {
        SetEnvironmentVariableW(reinterpret_cast<LPCWSTR>(v.name.c_str()), nullptr);
    }
}

}  // namespace fuzz
