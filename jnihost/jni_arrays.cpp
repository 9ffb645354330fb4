// JNI functions: byte arrays and object arrays, their elements and critical regions.
#include <algorithm>
#include <cstring>

#include "jni_call.h"

namespace jnihost {
namespace {

jsize JNICALL GetArrayLength(JNIEnv* env, jarray array) {
    ENTER(jsize, GetArrayLength);
    Obj* o = c.array(array, false);
    return o ? static_cast<jsize>(o->cls == c.vm().cByteArray ? o->bytes.size() : o->elems.size()) : 0;
}

jbyteArray JNICALL NewByteArray(JNIEnv* env, jsize len) {
    ENTER(jbyteArray, NewByteArray);
    if (len < 0)
        c.throwNew("java/lang/NegativeArraySizeException", std::to_string(len));
    if (len < 0 || c.injectedOom(c.vm().cByteArray))
        return nullptr;
    Obj* o = c.vm().make(c.vm().cByteArray);
    o->bytes.assign(len, 0);
    return static_cast<jbyteArray>(handle(o));
}

Obj* byteArray(Call& c, jarray a) {
    return c.instance(a, c.vm().cByteArray, "array");
}

jbyte* JNICALL GetByteArrayElements(JNIEnv* env, jbyteArray array, jboolean* isCopy) {
    ENTER(jbyte*, GetByteArrayElements);
    Obj* o = byteArray(c, array);
    return o ? reinterpret_cast<jbyte*>(
                   c.take(BlockKind::ByteElements, o, o->bytes.data(), o->bytes.size(), isCopy))
             : nullptr;
}

// Mode 0 copies back and frees, JNI_COMMIT copies back and keeps, JNI_ABORT only frees.
void releaseElements(Call& c, Obj* o, const void* elems, jint mode, BlockKind kind) {
    Block* b = c.findBlock(elems, o, kind);
    if (!b)
        return;
    if (mode != 0 && mode != JNI_COMMIT && mode != JNI_ABORT)
        c.fail("unknown mode " + std::to_string(mode));
    if (mode != JNI_ABORT) {
        std::memcpy(b->owner->bytes.data(), b->data.get(), std::min(b->size, b->owner->bytes.size()));
        ++c.vm().copyBacks;
    }
    if (mode != JNI_COMMIT)
        c.retire(b);
}

void JNICALL ReleaseByteArrayElements(JNIEnv* env, jbyteArray array, jbyte* elems, jint mode) {
    ENTER(void, ReleaseByteArrayElements);
    releaseElements(c, byteArray(c, array), elems, mode, BlockKind::ByteElements);
}

void JNICALL GetByteArrayRegion(JNIEnv* env, jbyteArray array, jsize start, jsize len, jbyte* buf) {
    ENTER(void, GetByteArrayRegion);
    Obj* o = byteArray(c, array);
    if (!o || !inBounds(c, o->bytes.size(), start, len, "java/lang/ArrayIndexOutOfBoundsException"))
        return;
    if (!buf && len > 0)
        c.fail("null buffer");
    if (buf && len > 0)
        std::memcpy(buf, o->bytes.data() + start, len);
}

void JNICALL SetByteArrayRegion(JNIEnv* env, jbyteArray array, jsize start, jsize len, const jbyte* buf) {
    ENTER(void, SetByteArrayRegion);
    Obj* o = byteArray(c, array);
    if (!o || !inBounds(c, o->bytes.size(), start, len, "java/lang/ArrayIndexOutOfBoundsException"))
        return;
    if (!buf && len > 0)
        c.fail("null buffer");
    if (buf && len > 0)
        std::memcpy(o->bytes.data() + start, buf, len);
}

jobjectArray JNICALL NewObjectArray(JNIEnv* env, jsize len, jclass clazz, jobject init) {
    ENTER(jobjectArray, NewObjectArray);
    ClassRec* k = c.cls(clazz, "element class");
    Obj* first;
    if (!k || !c.optObj(init, "initial element", first))
        return nullptr;
    if (first && !c.vm().isA(first->cls, k))
        return c.fail("initial element " + c.vm().describe(first) + " is not a " + k->name);
    if (len < 0)
        c.throwNew("java/lang/NegativeArraySizeException", std::to_string(len));
    ClassRec* arrayClass = c.vm().arrayOf(k);
    if (len < 0 || c.injectedOom(arrayClass))
        return nullptr;
    Obj* o = c.vm().make(arrayClass);
    o->elems.assign(len, first);
    return static_cast<jobjectArray>(handle(o));
}

// The object array, when index is inside it; otherwise ArrayIndexOutOfBoundsException.
Obj* element(Call& c, jobjectArray array, jsize index) {
    Obj* o = c.array(array, true);
    if (!o || (index >= 0 && static_cast<size_t>(index) < o->elems.size()))
        return o;
    c.throwNew(
        "java/lang/ArrayIndexOutOfBoundsException",
        "Index " + std::to_string(index) + " out of bounds for length " + std::to_string(o->elems.size()));
    return nullptr;
}

jobject JNICALL GetObjectArrayElement(JNIEnv* env, jobjectArray array, jsize index) {
    ENTER(jobject, GetObjectArrayElement);
    Obj* o = element(c, array, index);
    return o ? handle(o->elems[index]) : nullptr;
}

void JNICALL SetObjectArrayElement(JNIEnv* env, jobjectArray array, jsize index, jobject val) {
    ENTER(void, SetObjectArrayElement);
    Obj* o = element(c, array, index);
    Obj* v;
    if (!o || !c.optObj(val, "value", v))
        return;
    if (v && !c.vm().isA(v->cls, o->cls->element))
        return c.throwNew("java/lang/ArrayStoreException", v->cls->name);
    o->elems[index] = v;
}

void* JNICALL GetPrimitiveArrayCritical(JNIEnv* env, jarray array, jboolean* isCopy) {
    ENTER(void*, GetPrimitiveArrayCritical);
    Obj* o = byteArray(c, array);
    return o ? c.take(BlockKind::ArrayCritical, o, o->bytes.data(), o->bytes.size(), isCopy) : nullptr;
}

void JNICALL ReleasePrimitiveArrayCritical(JNIEnv* env, jarray array, void* carray, jint mode) {
    ENTER(void, ReleasePrimitiveArrayCritical);
    releaseElements(c, byteArray(c, array), carray, mode, BlockKind::ArrayCritical);
}

}  // namespace

void fillArraySlots(JNINativeInterface_& t) {
    SLOT(GetArrayLength), SLOT(NewByteArray);
    SLOT(GetByteArrayElements), SLOT(ReleaseByteArrayElements), SLOT(GetByteArrayRegion);
    SLOT(SetByteArrayRegion), SLOT(NewObjectArray), SLOT(GetObjectArrayElement), SLOT(SetObjectArrayElement);
    SLOT(GetPrimitiveArrayCritical), SLOT(ReleasePrimitiveArrayCritical);
}

}  // namespace jnihost
