// VelzipFile: lines and blocks to the file open for writing, from the file open for reading.
// Bytes pass to and from the streams unchanged; text crosses as modified UTF-8.
#include <cstring>
#include <memory>
#include <new>

#include "com_velmor_coreutil_toolkit_VelzipFile.h"
#include "velzip/velzip_state.h"

using namespace velzip;

namespace {

constexpr unsigned kLineBufferBytes = 2048;

// The checks this library adds before any native access to a block array: a null array,
// a negative length or one beyond the array is refused with id 14.
bool blockArgumentsFit(JNIEnv* env, jbyteArray array, jint length) {
    if (array == nullptr || length < 0 || length > arrayLength(env, array)) {
        recordFailure(kBadBufferSizes, kMsgBadBufferSizes);
        return false;
    }
    return true;
}

void recordReadFailure(int error) {
    recordFailure(kReadFailed, velform("Error: %d reading encoded input file.", error));
}

}  // namespace

extern "C" {

jboolean JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_printLineN(JNIEnv* env, jclass, jstring line) {
    if (outputStream == nullptr) {
        recordFailure(kNoOutputStream, kMsgNoOutputStream);
        return JNI_FALSE;
    }
    if (line == nullptr) {
        return JNI_FALSE;  // nothing to write; not a failure of the stream
    }
    const char* text = env->GetStringUTFChars(line, nullptr);
    if (text == nullptr) {
        return JNI_FALSE;  // out of memory: the virtual machine has an error pending
    }
    outputStream->write(reinterpret_cast<const unsigned char*>(text),
                        static_cast<unsigned>(std::strlen(text)));
    const int error = outputStream->geterror();
    env->ReleaseStringUTFChars(line, text);
    if (error != 0) {
        recordFailure(kWriteFailed, velform("Error writing encoded output file: %d", error));
        return JNI_FALSE;
    }
    return JNI_TRUE;
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_writeDataN(JNIEnv* env, jclass, jbyteArray data,
                                                                    jint length) {
    if (outputStream == nullptr) {
        recordFailure(kNoOutputStream, kMsgNoOutputStream);
        return -1;
    }
    if (!blockArgumentsFit(env, data, length)) {
        return 0;
    }
    jbyte* elements = env->GetByteArrayElements(data, nullptr);
    if (elements == nullptr) {
        return 0;
    }
    outputStream->write(reinterpret_cast<const unsigned char*>(elements), static_cast<unsigned>(length));
    env->ReleaseByteArrayElements(data, elements, JNI_ABORT);  // only read: nothing to copy back
    // A failed block write records nothing: Java's callers test the result alone.
    return outputStream->geterror() == 0 ? 1 : 0;
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_readDataN(JNIEnv* env, jclass, jbyteArray buffer,
                                                                   jint length) {
    if (inputStream == nullptr) {
        recordFailure(kNoInputStream, kMsgNoInputStream);
        return -1;
    }
    if (!blockArgumentsFit(env, buffer, length)) {
        return 0;
    }
    // At least one byte, so a zero length still gives a buffer to hand over.
    std::unique_ptr<unsigned char[]> native(new (std::nothrow) unsigned char[length > 0 ? length : 1]);
    if (!native) {
        return 0;
    }
    const int n = inputStream->read(native.get(), static_cast<unsigned>(length));
    if (n > 0) {  // a negative count copies nothing
        env->SetByteArrayRegion(buffer, 0, n < length ? n : length,
                                reinterpret_cast<const jbyte*>(native.get()));
    }
    native.reset();
    const int error = inputStream->geterror();
    if (error != 0) {
        recordReadFailure(error);
        return 0;
    }
    return n;
}

jstring JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_readLineN(JNIEnv* env, jclass) {
    if (inputStream == nullptr) {
        recordFailure(kNoInputStream, kMsgNoInputStream);
        return nullptr;
    }
    unsigned char buffer[kLineBufferBytes];
    const int n = inputStream->read(buffer, kLineBufferBytes - 1);
    if (n <= 0) {
        return nullptr;  // the end of the data: nothing recorded
    }
    if (n > static_cast<int>(kLineBufferBytes - 1)) {
        recordFailure(kLineOverrun, "Input stream buffer overrun. End of line not reached.");
        return nullptr;
    }
    buffer[n] = 0;
    jstring line = env->NewStringUTF(reinterpret_cast<const char*>(buffer));
    const int error = inputStream->geterror();
    if (error != 0) {
        recordReadFailure(error);
        return nullptr;  // the new string is dropped; its local reference ends with the call
    }
    return line;
}

}  // extern "C"
