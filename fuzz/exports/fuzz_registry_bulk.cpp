// The WinRegistry fuzz operations beyond single values: the bulk write of Hashtables holding
// wrong-type keys and values, the deletes of values and keys (empty, full, missing, whole
// trees), values planted straight through ADVAPI32 in types the family does not read, and
// the family's entry point.
#include <algorithm>
#include <cstring>

#include "registry_ops.h"

namespace fuzz {

namespace reg {

namespace {

// A table entry as the bulk write will meet it, in the table's order.
struct Entry {
    Name name;
    bool stringKey = true;
    Storable kind = Storable::Yes;
    regkit::RawValue stored;
};

}  // namespace

void opSetAll(RegistryCase& rc) {
    Case& c = rc.c;
    const Target to = writeTarget(rc);
    const bool nullTable = c.rng.chance(4);
    jobject table = nullTable ? nullptr : c.vm.newHashtable();
    std::vector<Entry> entries;
    const int count = static_cast<int>(c.rng.chance(5) ? c.rng.range(40, 200) : c.rng.range(0, 8));
    for (int i = 0; i < count && table; ++i) {
        Entry e;
        e.stringKey = !c.rng.chance(3);
        jobject key;
        if (e.stringKey) {
            e.name = anyName(rc);
            if (e.name.null) {
                continue;  // a Hashtable key is never null
            }
            bool again = false;
            for (const Entry& other : entries) {
                again = again || (other.stringKey && other.name.text == e.name.text);
            }
            if (again) {
                continue;  // one entry per key, as in any Hashtable
            }
            key = c.vm.newString(e.name.text);
        } else {
            key = c.vm.newInteger(static_cast<int32_t>(c.rng.next()));
        }
        jobject value = anyValue(c, &e.stored, &e.kind);
        if (value == nullptr) {
            c.vm.hashtablePutNullValue(table, key);
        } else {
            c.vm.hashtablePut(table, key, value);
        }
        entries.push_back(e);
    }
    c.call<void>(regkit::kSetValues, to.root, to.javaPath(c), table);
    const std::string got = raised(c);

    // The walk in table order: the first entry that cannot be written ends it.
    std::vector<std::string> allowed{writeRefusal(to, nullTable)};
    size_t written = 0;
    if (allowed.front().empty()) {
        allowed.clear();
        std::string stop;
        for (; written < entries.size() && stop.empty(); ++written) {
            const Entry& e = entries[written];
            if (!e.name.strict && e.stringKey) {
                allowed.push_back(kSetFailed);  // a name Windows may refuse
            }
            stop = !e.stringKey               ? "Non-String key in hashtable."
                   : e.kind == Storable::Null ? kNullValue
                   : e.kind == Storable::No   ? kNoType
                                              : "";
        }
        if (!stop.empty()) {
            --written;
        }
        allowed.insert(allowed.begin(), stop);
        if (!to.path.strict) {
            allowed.push_back(kCreateFailed);
        }
    }
    c.expect(oneOf(got, allowed), [&] {
        return "nativeSetRegistryValues(" + std::to_string(to.root) + ", " + show(to.path.text) + ", " +
               std::to_string(entries.size()) + " entries) raised " + quoted(got) + ", expected " +
               quoted(allowed.front());
    });
    if (got != allowed.front()) {
        return;  // stopped early by Windows: which entries were written is not known
    }
    // Entries written before the stop, each checked unless a later one shares its stored name.
    for (size_t i = 0; i < written; ++i) {
        const Entry& e = entries[i];
        bool shadowed = false;
        for (size_t j = i + 1; j < written; ++j) {
            shadowed =
                shadowed || upperCase(fromAnsi(entries[j].name.ansi)) == upperCase(fromAnsi(e.name.ansi));
        }
        if (!shadowed) {
            checkStored(c, to.root, to.path, e.name, e.stored);
        }
    }
}

void opDeleteValue(RegistryCase& rc) {
    Case& c = rc.c;
    const Target to = writeTarget(rc);
    const jint root = to.root;
    const KeyPath& path = to.path;
    const Name name = anyName(rc);
    std::string want;
    if (to.nullPath) {
        want = kNullRegistryKey;
    } else if (!regkit::keyCounts(path.ansi, hkey(root)).opens) {
        want = kOpenFailed;
    } else if (regkit::rawValue(path.ansi, name.raw(), hkey(root)).result != ERROR_SUCCESS) {
        want = "Unable to delete registry value";
    }
    c.call<void>(regkit::kDeleteValue, root, to.javaPath(c), javaName(c, name));
    const std::string got = raised(c);
    c.expect(got == want, [&] {
        return "nativeDeleteRegistryValue(" + std::to_string(root) + ", " + show(path.text) + ", " +
               (name.null ? "null" : show(name.text)) + ") raised " + quoted(got) + ", expected " +
               quoted(want);
    });
    if (want.empty()) {
        c.expect(regkit::rawValue(path.ansi, name.raw(), hkey(root)).result != ERROR_SUCCESS,
                 [&] { return "nativeDeleteRegistryValue left the value " + show(name.text); });
    }
}

void opDeleteKey(RegistryCase& rc) {
    Case& c = rc.c;
    Target to = writeTarget(rc);
    const jint root = to.root;
    const uint32_t shape = to.nullPath ? 0 : 1 + c.rng.below(24);
    KeyPath& path = to.path;
    if (shape == 1) {  // empty, or empty for every C reader
        path.text = c.rng.chance(50) ? u"" : std::u16string(u"\0", 1) + plainText(c.rng, 4);
        path.ansi = cutAtNul(ansiBytes(path.text));
    }
    static const jboolean flags[] = {0, 1, 2};
    const jboolean recursive = flags[c.rng.below(3)];
    const regkit::KeyCounts before = regkit::keyCounts(path.ansi, hkey(root));
    const bool empty = before.opens && before.subKeys == 0 && before.values == 0;
    std::vector<std::string> allowed;
    if (shape == 0) {
        allowed = {kNullRegistryKey};
    } else if (path.ansi.empty()) {
        allowed = {"Invalid registry key"};
    } else if (empty) {
        allowed = {"", "Error in call to RegDeleteKey()"};
    } else if (!recursive) {
        allowed = {"Unable to remove non-empty key"};
    } else if (before.opens) {
        allowed = {"", "Unable to delete one or more recursive keys"};
    } else {
        allowed = {"Unable to delete one or more recursive keys"};
    }
    c.call<void>(regkit::kDeleteKey, root, shape == 0 ? jstring{} : c.vm.newString(path.text), recursive);
    const std::string got = raised(c);
    // A plain key that opens must go; for an odd one Windows may refuse the delete itself.
    const bool mustGo = allowed.front().empty() && path.strict;
    c.expect(oneOf(got, allowed) && !(mustGo && !got.empty()), [&] {
        return "nativeDeleteRegistryKey(" + std::to_string(root) + ", " + show(path.text) + ", " +
               std::to_string(recursive) + ") raised " + quoted(got) + ", expected " +
               quoted(allowed.front()) + " (the key " +
               (before.opens ? "held " + std::to_string(before.subKeys) + " keys and " +
                                   std::to_string(before.values) + " values)"
                             : "does not open)");
    });
    const regkit::KeyCounts after = regkit::keyCounts(path.ansi, hkey(root));
    if (got.empty() && allowed.front().empty()) {
        c.expect(!after.opens, [&] { return "nativeDeleteRegistryKey left " + show(path.text); });
    } else if (!got.empty() && got != "Unable to delete one or more recursive keys") {
        c.expect(
            after.opens == before.opens && after.subKeys == before.subKeys && after.values == before.values,
            [&] {
                return "nativeDeleteRegistryKey raised " + quoted(got) + " and changed " + show(path.text);
            });
    }
}

// Values the family cannot write, planted past it: types it does not read, numbers of the
// wrong size, text without its NUL; and trees of keys to delete.
void opPlant(RegistryCase& rc) {
    Case& c = rc.c;
    const std::string key = rc.run.key.path();
    if (c.rng.chance(20)) {
        regkit::makeTree(key + "\\t", static_cast<int>(c.rng.range(1, 3)),
                         static_cast<int>(c.rng.range(1, 3)), c.rng.chance(50));
        return;
    }
    static const DWORD types[] = {REG_NONE, REG_SZ,       REG_EXPAND_SZ,     REG_BINARY, REG_DWORD,
                                  REG_LINK, REG_MULTI_SZ, REG_RESOURCE_LIST, REG_QWORD,  0x1234};
    const DWORD type = types[c.rng.below(10)];
    Bytes data = randomBytes(c.rng, c.rng.chance(10) ? 70000 : c.rng.below(12));
    if (type == REG_SZ && c.rng.chance(50)) {
        for (auto& b : data) {
            b = static_cast<uint8_t>('a' + b % 26);  // text without a terminating NUL
        }
    }
    Name name;
    name.text = plainText(c.rng, c.rng.range(1, 8));
    name.ansi = cutAtNul(ansiBytes(name.text));
    rc.names.push_back(name);
    regkit::setRawValue(key, name.ansi.c_str(), type, data.data(), static_cast<DWORD>(data.size()));
}

}  // namespace reg

void fuzzRegistry(Case& c, Run& run) {
    c.family = "registry";
    // A known start: the run's key exists and is empty.
    RegDeleteTreeA(HKEY_CURRENT_USER, run.key.path().c_str());
    regkit::setRawValue(run.key.path());
    reg::RegistryCase rc{c, run, {}};
    const int steps = static_cast<int>(c.rng.range(1, 25));
    for (int i = 0; i < steps && c.failures.empty(); ++i) {
        const uint32_t op = c.rng.below(100);
        if (op < 25) {
            reg::opSet(rc);
        } else if (op < 50) {
            reg::opGet(rc);
        } else if (op < 62) {
            reg::opSetAll(rc);
        } else if (op < 72) {
            reg::opDeleteValue(rc);
        } else if (op < 82) {
            reg::opDeleteKey(rc);
        } else {
            reg::opPlant(rc);
        }
    }
}

}  // namespace fuzz
