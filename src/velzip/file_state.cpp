// VelzipFile: the Velzip file state, opening and closing the one file, and the last failure.
#include "com_velmor_coreutil_toolkit_VelzipFile.h"
#include "velzip/velzip_state.h"

#include <new>

namespace velzip {

int fid = -1;
Zel::Stream* inputStream = nullptr;
Zel::Stream* outputStream = nullptr;
const char* errorMsg = nullptr;
int errorId = 0;
Zel_Compress* compressor = nullptr;

const char kMsgNoOutputStream[] = "Output stream has not been initialized.";
const char kMsgNoInputStream[] = "Input stream has not been initialized.";
const char kMsgBadBufferSizes[] = "Incorrect buffer sizes specified.";

void recordFailure(int id, const char* message) {
    errorId = id;
    errorMsg = message;
}

bool ensureCompressor() {
    if (compressor == nullptr) {
        compressor = new (std::nothrow) Zel_Compress();
        if (compressor == nullptr) {
            return false;
        }
        compressor->SetVersion(3, 8);
        compressor->SetCompressFlags(1, 0);
    }
    return true;
}

jint arrayLength(JNIEnv* env, jarray array) {
    return array == nullptr ? -1 : env->GetArrayLength(array);
}

}  // namespace velzip

namespace {

using namespace velzip;

// The library's one static object: constructed at load (its destructor goes on this
// library's exit list), destroyed at unload.
Zel::FileInit fileInit;

// Closes whatever stream is open and forgets it; the failure record is left alone.
void closeStreams() {
    if (inputStream != nullptr) {
        Zel::File::close(inputStream);
    }
    if (outputStream != nullptr) {
        Zel::File::close(outputStream);
    }
    inputStream = nullptr;
    outputStream = nullptr;
    fid = -1;
}

bool openForRead(const char* path) {
    if (!Zel::File::exist(path)) {
        recordFailure(kMissing, velform("File %s does not exist.", path));
        return false;
    }
    if (!Zel::File::canread(path)) {
        recordFailure(kNotReadable, velform("File %s does not have read permissions.", path));
        return false;
    }
    inputStream = Zel::File::open(path, Zel::Stream::Access(1), true);
    if (inputStream == nullptr) {
        recordFailure(kOpenForRead, velform("Failure to open file %s for read.", path));
        return false;
    }
    fid = inputStream->getfid();
    return true;
}

bool openForWrite(const char* path) {
    if (!Zel::File::canwrite(path)) {
        recordFailure(kNotWritable, velform("Cannot write to file %s.", path));
        return false;
    }
    outputStream = Zel::File::open(path, Zel::Stream::Access(170), true);
    if (outputStream == nullptr) {
        recordFailure(kOpenForWrite, velform("Failure to open file %s for write.", path));
        return false;
    }
    fid = outputStream->getfid();
    return true;
}

}  // namespace

extern "C" {

void JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_initialize(JNIEnv*, jclass) {}

jboolean JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_openFileN(JNIEnv* env, jclass, jstring path,
                                                                       jboolean forWrite) {
    // The reset. Streams still open from an earlier open are closed through the library
    // rather than forgotten, so they neither leak nor lose data not yet written out.
    closeStreams();
    errorMsg = nullptr;
    errorId = 0;

    const char* text = path == nullptr ? nullptr : env->GetStringUTFChars(path, nullptr);
    if (text == nullptr) {
        recordFailure(kNullPath, "NULL file path detected.\n");
        return JNI_FALSE;
    }
    if (text[0] == '\0') {
        recordFailure(kEmptyPath, "File path is the empty string.\n");
        env->ReleaseStringUTFChars(path, text);
        return JNI_FALSE;
    }
    const bool write = forWrite == 1;
    const bool opened = write ? openForWrite(text) : openForRead(text);
    env->ReleaseStringUTFChars(path, text);
    Zel::Stream* stream = write ? outputStream : inputStream;
    return opened && stream != nullptr ? JNI_TRUE : JNI_FALSE;
}

jboolean JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_closeFileN(JNIEnv*, jclass) {
    closeStreams();
    return JNI_TRUE;
}

jstring JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getErrorMsgN(JNIEnv* env, jclass) {
    return errorMsg == nullptr ? nullptr : env->NewStringUTF(errorMsg);
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getErrorIdN(JNIEnv*, jclass) {
    return errorId;
}

}  // extern "C"
