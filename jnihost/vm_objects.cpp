// The object store: making and resolving objects, Hashtable's equals and hash, throwing,
// and describing an object for messages.
#include <functional>
#include <utility>

#include "vm_state.h"

namespace jnihost {

Obj* VmState::make(ClassRec* c) {
    objects.push_back(std::make_unique<Obj>());
    objects.back()->cls = c;
    live.insert(objects.back().get());
    return objects.back().get();
}

Obj* VmState::makeString(std::u16string chars) {
    Obj* o = make(cString);
    o->chars = std::move(chars);
    return o;
}

Obj* VmState::resolve(const void* h) const {
    Obj* o = static_cast<Obj*>(const_cast<void*>(h));
    return live.count(o) ? o : nullptr;
}

namespace {
// Java's equals for the keys the library uses: String by content, Integer by value.
bool javaEquals(const VmState& s, const Obj* a, const Obj* b) {
    if (a == b)
        return true;
    if (a->cls != b->cls)
        return false;
    return a->cls == s.cString ? a->chars == b->chars : a->cls == s.cInteger && a->intValue == b->intValue;
}

// Hashed as Java hashes the keys the library uses, so equal keys meet in one bucket and a
// table of thousands of entries costs what it costs in a real JVM, not a scan per call.
size_t javaHash(const VmState& s, const Obj* key) {
    if (key->cls == s.cString)
        return std::hash<std::u16string>()(key->chars);
    if (key->cls == s.cInteger)
        return static_cast<size_t>(key->intValue);
    return std::hash<const Obj*>()(key);
}

std::pair<Obj*, Obj*>* findEntry(const VmState& s, Obj* table, Obj* key) {
    auto [first, last] = table->entryIndex.equal_range(javaHash(s, key));
    for (auto it = first; it != last; ++it) {
        auto& entry = table->entries[it->second];
        if (javaEquals(s, entry.first, key))
            return &entry;
    }
    return nullptr;
}
}  // namespace

Obj* VmState::hashtableGet(Obj* table, Obj* key) const {
    const auto* entry = findEntry(*this, table, key);
    return entry ? entry->second : nullptr;
}

Obj* VmState::hashtablePut(Obj* table, Obj* key, Obj* value) {
    if (auto* entry = findEntry(*this, table, key))
        return std::exchange(entry->second, value);
    table->entryIndex.emplace(javaHash(*this, key), table->entries.size());
    table->entries.emplace_back(key, value);
    return nullptr;
}

void VmState::throwNew(HostEnv& env, const std::string& className, const std::u16string& message,
                       bool nullMessage) {
    Obj* e = make(findClass(className));
    if (!nullMessage)
        field(e, "detailMessage").l = handle(makeString(message));
    env.pending = e;
}

std::string VmState::describe(const Obj* o) const {
    const std::string& name = o->cls->name;
    if (o->cls == cString) {
        return name + " \"" + utf8(o->chars.substr(0, 60)) + (o->chars.size() > 60 ? "...\"" : "\"");
    }
    if (name[0] == '[') {
        return name + " of length " +
               std::to_string(o->cls == cByteArray ? o->bytes.size() : o->elems.size());
    }
    if (o->asClass)
        return "class " + o->asClass->name;
    auto it = o->fields.find(detailMessage);
    return it == o->fields.end() || !it->second.l ? name : name + ": " + utf8(objOf(it->second.l)->chars);
}

}  // namespace jnihost
