// What the WinRegistry fuzz operations share: the roots, key paths, value names and value
// objects they draw, the messages of the family, and the checks past the library.
#pragma once

#include <windows.h>

#include <string>
#include <vector>

#include "fuzz_case.h"
#include "fuzz_run.h"
#include "registry_kit.h"

namespace fuzz::reg {

inline constexpr jint kCurrentUser = static_cast<jint>(0x80000001);
extern const std::vector<jint> kNoKeyRoots;

inline constexpr char kOpenFailed[] = "Unable to open registry key";
inline constexpr char kCreateFailed[] = "Unable to create/open registry key";
inline constexpr char kSetFailed[] = "Unable to set registry value.  Error in RegSetValueEx() call.";
inline constexpr char kNoType[] = "Unable to determine type for registry value";
inline constexpr char kNullValue[] = "Cannot set registry value to null object";
inline constexpr char kNullKey[] = "Cannot work with null key";
inline constexpr char kNullRegistryKey[] = "Cannot work with null registry key";

inline HKEY hkey(jint root) {
    return reinterpret_cast<HKEY>(static_cast<LONG_PTR>(root));
}

// A key path: the run's key, or below it with plain, odd, empty or doubled-backslash parts.
// `strict` when it is plain enough that every call on it must work.
struct KeyPath {
    std::u16string text;
    std::string ansi;  // as the library hands it to Windows
    bool strict = false;
};

// A value name: null (the default value), empty, one used before in the case, or new.
struct Name {
    bool null = false;
    std::u16string text;
    std::string ansi;
    bool strict = true;  // short enough that every write must work
    const char* raw() const { return null ? nullptr : ansi.c_str(); }
};

// A value object for a write: storable (string, Integer, byte[]), null, or of a class that
// cannot be stored.
enum class Storable { Yes, Null, No };

// One registry case: its draws, and the names used so far (reused to hit existing values).
struct RegistryCase {
    Case& c;
    Run& run;
    std::vector<Name> names;
};

// Where a write or delete goes: mostly the current user's root, now and then a number that is
// no key; a key path below the run's key, or null.
struct Target {
    jint root;
    bool nullPath;
    KeyPath path;
    jstring javaPath(Case& c) const { return nullPath ? nullptr : c.vm.newString(path.text); }
};

KeyPath keyPath(Case& c, const Run& run);
Target writeTarget(RegistryCase& rc);
Name anyName(RegistryCase& rc);
jstring javaName(Case& c, const Name& n);
// The object, and in `stored` what the registry must then hold.
jobject anyValue(Case& c, regkit::RawValue* stored, Storable* kind);

// The CoreUtilException raised by the call, as its message; empty when none. Any other
// exception is a failure.
std::string raised(Case& c);
std::string quoted(const std::string& message);
bool oneOf(const std::string& got, const std::vector<std::string>& allowed);
// What every write refuses before it looks at the value: a null value or table, then a null
// path, then a root that is no key. Empty when none applies.
std::string writeRefusal(const Target& to, bool nullObject);
// The value a write left, read past the library.
void checkStored(Case& c, jint root, const KeyPath& path, const Name& name, const regkit::RawValue& want);

void opSet(RegistryCase& rc);
void opGet(RegistryCase& rc);
void opSetAll(RegistryCase& rc);
void opDeleteValue(RegistryCase& rc);
void opDeleteKey(RegistryCase& rc);
void opPlant(RegistryCase& rc);

}  // namespace fuzz::reg
