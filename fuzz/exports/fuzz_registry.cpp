// The WinRegistry family under fuzz: reads, writes and deletes with non-root-key numbers, odd
// key paths, adversarial names and values, Hashtables holding objects of the wrong type, and
// values of types the family does not read planted straight through ADVAPI32. Each result is
// predicted from the registry as ADVAPI32 shows it just before the call.
#include <algorithm>
#include <climits>
#include <map>

#include "registry_ops.h"

namespace fuzz::reg {

// Numbers that name no key: zero, unused predefined values, values beyond any handle table,
// and the process pseudo-handle.
const std::vector<jint> kNoKeyRoots = {0,
                                       static_cast<jint>(0x80000009),
                                       static_cast<jint>(0x8000000F),
                                       0x7FFFFFF0,
                                       static_cast<jint>(0x800000FF),
                                       0x40000000,
                                       0x12345678,
                                       -1};
// Real roots other than the current user's: read, never written.
const std::vector<jint> kReadOnlyRoots = {static_cast<jint>(0x80000000), static_cast<jint>(0x80000002),
                                          static_cast<jint>(0x80000003), static_cast<jint>(0x80000005)};

namespace {

const char kNoConversion[] = "Unable to convert MS registry value to java";
const char kQueryFailed[] = "RegQueryValueEx() call failed";

// A Java value as a comparable record: kind 's' text, 'i' number, 'b' bytes; 0 for none.
struct Value {
    char kind = 0;
    std::u16string text;
    int32_t number = 0;
    Bytes bytes;
    bool operator==(const Value& o) const {
        return kind == o.kind && text == o.text && number == o.number && bytes == o.bytes;
    }
};

std::string describe(const Value& v) {
    switch (v.kind) {
        case 's':
            return "string " + show(v.text);
        case 'i':
            return "Integer " + std::to_string(v.number);
        case 'b':
            return "byte[] " + showBytes(v.bytes);
        default:
            return "null";
    }
}

Value valueOf(Case& c, jobject o) {
    Value v;
    if (o == nullptr) {
        return v;
    }
    const std::string cls = c.vm.classNameOf(o);
    if (cls == "java/lang/String") {
        v.kind = 's';
        v.text = c.vm.stringValue(o);
    } else if (cls == "java/lang/Integer") {
        v.kind = 'i';
        v.number = c.vm.integerValue(o);
    } else if (cls == "[B") {
        v.kind = 'b';
        v.bytes = c.vm.byteArrayValue(o);
    } else {
        v.kind = '?';
        v.text = std::u16string(cls.begin(), cls.end());
    }
    return v;
}

// What reading a stored value gives: the object, or the message raised.
struct Read {
    Value value;
    std::string error;
};

Read predictRead(const regkit::RawValue& raw) {
    Read r;
    if (raw.result != ERROR_SUCCESS) {
        r.error = kQueryFailed;
        return r;
    }
    const std::string data(raw.data.begin(), raw.data.end());
    switch (raw.type) {
        case REG_SZ:
            r.value.kind = 's';
            r.value.text = fromAnsi(cutAtNul(data));
            return r;
        case REG_DWORD:
            if (raw.data.size() >= 4) {
                r.value.kind = 'i';
                r.value.number = static_cast<int32_t>(raw.data[0] | raw.data[1] << 8 | raw.data[2] << 16 |
                                                      static_cast<uint32_t>(raw.data[3]) << 24);
                return r;
            }
            break;
        case REG_BINARY:
            r.value.kind = 'b';
            r.value.bytes = raw.data;
            return r;
        default:
            break;
    }
    r.error = kNoConversion;
    return r;
}

}  // namespace

KeyPath keyPath(Case& c, const Run& run) {
    KeyPath p;
    p.text = u16(std::wstring(run.key.path().begin(), run.key.path().end()));
    p.strict = true;
    switch (c.rng.below(10)) {
        case 0:
        case 1:
        case 2:
        case 3:
            break;
        case 4:
        case 5:
            p.text += u"\\" + plainText(c.rng, c.rng.range(1, 6));
            break;
        case 6:
            p.text += u"\\t\\" + plainText(c.rng, 1) + u"\\" + plainText(c.rng, 1);
            break;
        case 7:
            p.text += c.rng.chance(50) ? u"\\" : u"\\\\" + plainText(c.rng, 3);
            p.strict = false;
            break;
        default:
            p.text += u"\\" + nameText(c.rng);
            p.strict = false;
    }
    p.ansi = cutAtNul(ansiBytes(p.text));
    return p;
}

Name anyName(RegistryCase& rc) {
    Case& c = rc.c;
    std::vector<Name>& used = rc.names;
    Name n;
    const uint32_t pick = c.rng.below(20);
    if (pick == 0) {
        n.null = true;
        return n;
    }
    if (pick < 8 && !used.empty()) {
        return c.rng.pick(used);
    }
    n.text = pick < 12 ? plainText(c.rng, c.rng.range(1, 10)) : nameText(c.rng);
    n.ansi = cutAtNul(ansiBytes(n.text));
    n.strict = n.ansi.size() <= 255;
    used.push_back(n);
    return n;
}

jstring javaName(Case& c, const Name& n) {
    return n.null ? nullptr : c.vm.newString(n.text);
}

jobject anyValue(Case& c, regkit::RawValue* stored, Storable* kind) {
    *kind = Storable::Yes;
    const uint32_t r = c.rng.below(100);
    if (r < 30) {
        const std::u16string text = anyText(c.rng);
        const std::string ansi = ansiBytes(text);
        stored->type = REG_SZ;
        stored->data.assign(ansi.begin(), ansi.end());
        stored->data.push_back(0);
        return c.vm.newString(text);
    }
    if (r < 50) {
        static const int32_t edges[] = {0, -1, INT_MIN, INT_MAX};
        const int32_t n = c.rng.chance(30) ? edges[c.rng.below(4)] : static_cast<int32_t>(c.rng.next());
        stored->type = REG_DWORD;
        stored->data = {static_cast<uint8_t>(n), static_cast<uint8_t>(n >> 8), static_cast<uint8_t>(n >> 16),
                        static_cast<uint8_t>(n >> 24)};
        return c.vm.newInteger(n);
    }
    if (r < 70) {
        const size_t size = c.rng.chance(10) ? 0 : c.rng.chance(5) ? 100000 : c.rng.below(300);
        stored->type = REG_BINARY;
        stored->data = randomBytes(c.rng, size);
        return c.vm.newByteArray(stored->data);
    }
    if (r < 74) {
        *kind = Storable::Null;
        return nullptr;
    }
    *kind = Storable::No;
    switch (c.rng.below(6)) {
        case 0:
            return c.vm.newInstance("java/lang/Long");
        case 1:
            return c.vm.newInstance("java/lang/Double");
        case 2:
            return c.vm.newHashtable();
        case 3:
            return c.vm.newStringArray({c.vm.newString(u"a")});
        case 4:
            return c.vm.newPoint(1, 2);
        default:
            return c.vm.newPlainObject();
    }
}

std::string raised(Case& c) {
    const jnihost::PendingException e = c.takeException();
    if (e.className.empty()) {
        return {};
    }
    c.expect(e.className == jnihost::kCoreUtilException,
             [&] { return "left " + e.className + " pending: " + e.message; });
    return e.message;
}

std::string quoted(const std::string& message) {
    return message.empty() ? "no exception" : "\"" + message + "\"";
}

bool oneOf(const std::string& got, const std::vector<std::string>& allowed) {
    return std::find(allowed.begin(), allowed.end(), got) != allowed.end();
}

void checkStored(Case& c, jint root, const KeyPath& path, const Name& name, const regkit::RawValue& want) {
    const regkit::RawValue got = regkit::rawValue(path.ansi, name.raw(), hkey(root));
    c.expect(got.result == ERROR_SUCCESS && got.type == want.type && got.data == want.data, [&] {
        return "the registry holds type " + std::to_string(got.type) + " " + showBytes(got.data) + " under " +
               show(name.text) + ", expected type " + std::to_string(want.type) + " " + showBytes(want.data);
    });
}

Target writeTarget(RegistryCase& rc) {
    Case& c = rc.c;
    const jint root = c.rng.chance(85) ? kCurrentUser : c.rng.pick(kNoKeyRoots);
    const bool nullPath = c.rng.chance(4);
    return Target{root, nullPath, keyPath(c, rc.run)};
}

std::string writeRefusal(const Target& to, bool nullObject) {
    if (nullObject) {
        return kNullValue;
    }
    if (to.nullPath) {
        return kNullKey;
    }
    return to.root != kCurrentUser ? kCreateFailed : "";
}

void opSet(RegistryCase& rc) {
    Case& c = rc.c;
    const Target to = writeTarget(rc);
    const Name name = anyName(rc);
    regkit::RawValue stored;
    Storable kind;
    jobject value = anyValue(c, &stored, &kind);
    c.call<void>(regkit::kSetValue, to.root, to.javaPath(c), javaName(c, name), value);
    const std::string got = raised(c);

    std::vector<std::string> allowed{writeRefusal(to, kind == Storable::Null)};
    if (allowed.front().empty()) {
        allowed = {kind == Storable::No ? kNoType : ""};
        if (!to.path.strict) {
            allowed.push_back(kCreateFailed);
        }
        if (!name.strict && kind == Storable::Yes) {
            allowed.push_back(kSetFailed);
        }
    }
    c.expect(oneOf(got, allowed), [&] {
        return "nativeSetRegistryValue(" + std::to_string(to.root) + ", " + show(to.path.text) + ", " +
               (name.null ? "null" : show(name.text)) + ") raised " + quoted(got) + ", expected " +
               quoted(allowed.front());
    });
    if (got.empty() && kind == Storable::Yes) {
        checkStored(c, to.root, to.path, name, stored);
    }
}

void opGet(RegistryCase& rc) {
    Case& c = rc.c;
    const uint32_t r = c.rng.below(20);
    const jint root = r < 15 ? kCurrentUser : r < 18 ? c.rng.pick(kNoKeyRoots) : c.rng.pick(kReadOnlyRoots);
    const bool nullPath = c.rng.chance(4);
    KeyPath path = keyPath(c, rc.run);
    if (root != kCurrentUser && c.rng.chance(50)) {
        path.text = c.rng.chance(30) ? u"" : nameText(c.rng);
        path.ansi = cutAtNul(ansiBytes(path.text));
    }
    const Name name = anyName(rc);
    const bool all = c.rng.chance(35);
    // The prediction, from the registry before the call.
    Read want;
    std::map<std::u16string, Value> table;
    if (nullPath) {
        want.error = kNullRegistryKey;
    } else if (!regkit::keyCounts(path.ansi, hkey(root)).opens) {
        want.error = kOpenFailed;
    } else if (!all) {
        want = predictRead(regkit::rawValue(path.ansi, name.raw(), hkey(root)));
    } else {
        for (const auto& [n, raw] : regkit::rawValues(path.ansi, hkey(root))) {
            if (n.size() > 255) {
                break;  // a name that does not fit ends the bulk read
            }
            const Read r = predictRead(raw);
            if (!r.error.empty()) {
                want.error = r.error;
                break;
            }
            table[fromAnsi(n)] = r.value;
        }
    }
    const jstring jpath = nullPath ? nullptr : c.vm.newString(path.text);
    jobject result = all ? c.call<jobject>(regkit::kGetValues, root, jpath)
                         : c.call<jobject>(regkit::kGetValue, root, jpath, javaName(c, name));
    const std::string got = raised(c);
    auto where = [&] {
        return std::string(all ? "nativeGetRegistryValues(" : "nativeGetRegistryValue(") +
               std::to_string(root) + ", " + (nullPath ? "null" : show(path.text)) +
               (all ? "" : ", " + (name.null ? "null" : show(name.text))) + ")";
    };
    c.expect(got == want.error && (result == nullptr) == !got.empty(), [&] {
        return where() + " raised " + quoted(got) + (result ? " with a result" : " without a result") +
               ", expected " + quoted(want.error);
    });
    if (result == nullptr || !got.empty()) {
        return;
    }
    if (!all) {
        const Value v = valueOf(c, result);
        c.expect(v == want.value,
                 [&] { return where() + " gave " + describe(v) + ", expected " + describe(want.value); });
        return;
    }
    std::map<std::u16string, Value> seen;
    for (const auto& [k, v] : c.vm.hashtableEntries(result)) {
        seen[c.vm.stringValue(k)] = valueOf(c, v);
    }
    c.expect(seen == table, [&] {
        return where() + " gave " + std::to_string(seen.size()) + " entries, expected " +
               std::to_string(table.size()) + " (or the values differ)";
    });
}

}  // namespace fuzz::reg
