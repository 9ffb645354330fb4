// JNI functions: strings, their characters and critical regions.
#include <cstdio>
#include <cstring>
#include <utility>

#include "jni_call.h"

namespace jnihost {
namespace {

Obj* str(Call& c, jstring s) {
    return c.instance(s, c.vm().cString, "string");
}

jsize JNICALL GetStringLength(JNIEnv* env, jstring s) {
    ENTER(jsize, GetStringLength);
    Obj* o = str(c, s);
    return o ? static_cast<jsize>(o->chars.size()) : 0;
}

const jchar* JNICALL GetStringChars(JNIEnv* env, jstring s, jboolean* isCopy) {
    ENTER(const jchar*, GetStringChars);
    Obj* o = str(c, s);
    if (!o)
        return nullptr;
    return reinterpret_cast<jchar*>(
        c.take(BlockKind::StringChars, o, o->chars.data(), o->chars.size() * 2, isCopy));
}

void releaseChars(Call& c, jstring s, const void* chars, BlockKind kind) {
    Obj* o = str(c, s);
    if (Block* b = c.findBlock(chars, o, kind))
        c.retire(b);
}

void JNICALL ReleaseStringChars(JNIEnv* env, jstring s, const jchar* chars) {
    ENTER(void, ReleaseStringChars);
    releaseChars(c, s, chars, BlockKind::StringChars);
}

jsize JNICALL GetStringUTFLength(JNIEnv* env, jstring s) {
    ENTER(jsize, GetStringUTFLength);
    Obj* o = str(c, s);
    return o ? static_cast<jsize>(toModifiedUtf8(o->chars).size()) : 0;
}

const char* JNICALL GetStringUTFChars(JNIEnv* env, jstring s, jboolean* isCopy) {
    ENTER(const char*, GetStringUTFChars);
    Obj* o = str(c, s);
    if (!o)
        return nullptr;
    const std::string m = toModifiedUtf8(o->chars);
    return c.take(BlockKind::StringUtfChars, o, m.data(), m.size(), isCopy);
}

void JNICALL ReleaseStringUTFChars(JNIEnv* env, jstring s, const char* chars) {
    ENTER(void, ReleaseStringUTFChars);
    releaseChars(c, s, chars, BlockKind::StringUtfChars);
}

void JNICALL GetStringRegion(JNIEnv* env, jstring s, jsize start, jsize len, jchar* buf) {
    ENTER(void, GetStringRegion);
    Obj* o = str(c, s);
    if (!o || !inBounds(c, o->chars.size(), start, len, "java/lang/StringIndexOutOfBoundsException"))
        return;
    if (!buf && len > 0)
        c.fail("null buffer");
    if (buf)
        std::memcpy(buf, o->chars.data() + start, len * sizeof(jchar));
}

void JNICALL GetStringUTFRegion(JNIEnv* env, jstring s, jsize start, jsize len, char* buf) {
    ENTER(void, GetStringUTFRegion);
    Obj* o = str(c, s);
    if (!o || !inBounds(c, o->chars.size(), start, len, "java/lang/StringIndexOutOfBoundsException"))
        return;
    const std::string m = toModifiedUtf8(o->chars.substr(start, len));
    if (!buf)
        c.fail("null buffer");
    if (buf)
        std::memcpy(buf, m.c_str(), m.size() + 1);  // terminated, as by the JVM
}

jstring JNICALL NewString(JNIEnv* env, const jchar* unicode, jsize len) {
    ENTER(jstring, NewString);
    if (len < 0 || (!unicode && len > 0))
        return c.fail("null text or negative length");
    if (c.injectedOom(c.vm().cString))
        return nullptr;
    return static_cast<jstring>(
        handle(c.vm().makeString(std::u16string(reinterpret_cast<const char16_t*>(unicode), len))));
}

jstring JNICALL NewStringUTF(JNIEnv* env, const char* utf) {
    ENTER(jstring, NewStringUTF);
    if (!utf)
        return nullptr;  // as HotSpot, without an exception
    std::u16string text;
    if (!fromModifiedUtf8(utf, text)) {
        std::string bytes;  // shown escaped: the usual cause is ANSI or standard UTF-8 text
        for (const char* p = utf; *p && bytes.size() < 160; ++p) {
            char b[8];
            std::snprintf(b, sizeof b, (*p & 0x80) || *p < 0x20 ? "\\x%02X" : "%c",
                          static_cast<unsigned char>(*p));
            bytes += b;
        }
        c.fail("\"" + bytes + "\" is not modified UTF-8");
    }
    if (c.injectedOom(c.vm().cString))
        return nullptr;
    return static_cast<jstring>(handle(c.vm().makeString(std::move(text))));
}

const jchar* JNICALL GetStringCritical(JNIEnv* env, jstring s, jboolean* isCopy) {
    ENTER(const jchar*, GetStringCritical);
    Obj* o = str(c, s);
    return o ? reinterpret_cast<jchar*>(
                   c.take(BlockKind::StringCritical, o, o->chars.data(), o->chars.size() * 2, isCopy))
             : nullptr;
}

void JNICALL ReleaseStringCritical(JNIEnv* env, jstring s, const jchar* chars) {
    ENTER(void, ReleaseStringCritical);
    releaseChars(c, s, chars, BlockKind::StringCritical);
}

}  // namespace

void fillStringSlots(JNINativeInterface_& t) {
    SLOT(GetStringLength), SLOT(GetStringChars), SLOT(ReleaseStringChars), SLOT(GetStringUTFLength);
    SLOT(GetStringUTFChars), SLOT(ReleaseStringUTFChars), SLOT(GetStringRegion), SLOT(GetStringUTFRegion);
    SLOT(NewString), SLOT(NewStringUTF);
    SLOT(GetStringCritical), SLOT(ReleaseStringCritical);
}

}  // namespace jnihost
