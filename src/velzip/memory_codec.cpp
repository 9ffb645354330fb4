// VelzipFile: compressing and decompressing byte arrays with the shared compressor, and the
// questions about a Velzip header, of the open file or held in a Java array.
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>

#include "com_velmor_coreutil_toolkit_VelzipFile.h"
#include "velzip/size_bounds.h"
#include "velzip/velzip_state.h"

using namespace velzip;

namespace {

enum class Codec { Compress, UnCompress };

// The size checks (size_bounds.cpp), after the checks this library adds: null
// arrays, negative sizes and sizes beyond the arrays are refused the same way.
bool sizesFit(JNIEnv* env, Codec codec, jbyteArray dst, jint dstSize, jbyteArray src, jint srcSize) {
    if (dst == nullptr || src == nullptr || dstSize < 0 || srcSize < 0 || srcSize > arrayLength(env, src) ||
        dstSize > arrayLength(env, dst)) {
        return false;
    }
    return codec == Codec::Compress ? encodeSizesFit(dstSize, srcSize) : decodeSizesFit(dstSize, srcSize);
}

jint runCodec(JNIEnv* env, Codec codec, jbyteArray dst, jint dstSize, jbyteArray src, jint srcSize) {
    if (!sizesFit(env, codec, dst, dstSize, src, srcSize)) {
        recordFailure(kBadBufferSizes, kMsgBadBufferSizes);
        return 0;
    }
    jbyte* source = env->GetByteArrayElements(src, nullptr);
    if (source == nullptr) {
        return 0;
    }
    unsigned int n = 0;
    if (ensureCompressor()) {
        std::unique_ptr<unsigned char[]> out(new (std::nothrow) unsigned char[dstSize]);
        if (out) {
            const auto* in = reinterpret_cast<const unsigned char*>(source);
            n = codec == Codec::Compress
                    ? compressor->Compress(out.get(), static_cast<unsigned>(dstSize), in, srcSize)
                    : compressor->UnCompress(out.get(), static_cast<unsigned>(dstSize), in, srcSize);
            const jsize copy = n <= static_cast<unsigned>(dstSize) ? static_cast<jsize>(n) : dstSize;
            env->SetByteArrayRegion(dst, 0, copy, reinterpret_cast<const jbyte*>(out.get()));
        }
    }
    // Only read: copying the source back would overwrite the output when dst is src.
    env->ReleaseByteArrayElements(src, source, JNI_ABORT);
    return static_cast<jint>(n);
}

// The queries about the open file: with none open, id 9 is recorded; then the compressor is
// made, as for every query but isVelmorEncryptedN.
bool openFileQueryReady() {
    if (fid < 0) {
        recordFailure(kNoInputStream, kMsgNoInputStream);
        return false;
    }
    return ensureCompressor();
}

// The byte-array header queries: a null array or one shorter than a header gives 0 without
// reading it; nothing is recorded either way.
template <class Query>
jint queryHeader(JNIEnv* env, jbyteArray header, Query query) {
    if (!ensureCompressor()) {
        return 0;
    }
    const unsigned int headerBytes = Zel_Compress::GetNumHeaderBytes();
    const jint length = arrayLength(env, header);
    if (length < 0 || static_cast<unsigned>(length) < headerBytes) {
        return 0;
    }
    jbyte* elements = env->GetByteArrayElements(header, nullptr);
    if (elements == nullptr) {
        return 0;
    }
    const unsigned int n = query(reinterpret_cast<const unsigned char*>(elements));
    env->ReleaseByteArrayElements(header, elements, JNI_ABORT);  // only read
    return static_cast<jint>(n);
}

}  // namespace

extern "C" {

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_encodeMemN(JNIEnv* env, jclass, jbyteArray dst,
                                                                    jint dstSize, jbyteArray src,
                                                                    jint srcSize) {
    return runCodec(env, Codec::Compress, dst, dstSize, src, srcSize);
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_decodeMemN(JNIEnv* env, jclass, jbyteArray dst,
                                                                    jint dstSize, jbyteArray src,
                                                                    jint srcSize) {
    return runCodec(env, Codec::UnCompress, dst, dstSize, src, srcSize);
}

jboolean JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_isVelmorZipN(JNIEnv*, jclass) {
    if (!openFileQueryReady()) {
        return JNI_FALSE;
    }
    return Zel_Compress::IsVelmorZipFormat(Zel::FileDesc(fid), 1) == 1 ? JNI_TRUE : JNI_FALSE;
}

jboolean JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_isVelmorEncryptedN(JNIEnv*, jclass) {
    if (fid < 0 || inputStream == nullptr) {
        recordFailure(kNoInputStream, kMsgNoInputStream);
        return JNI_FALSE;
    }
    const char* version = inputStream->get_zf_version();
    return version != nullptr && std::strcmp(version, "00") == 0 ? JNI_FALSE : JNI_TRUE;
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getNumCompressedBytesN__(JNIEnv*, jclass) {
    if (!openFileQueryReady()) {
        return 0;
    }
    return static_cast<jint>(Zel_Compress::GetNumCompressedBytes(Zel::FileDesc(fid)));
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getNumCompressedBytesN___3B(JNIEnv* env, jclass,
                                                                                     jbyteArray header) {
    return queryHeader(env, header,
                       [](const unsigned char* h) { return Zel_Compress::GetNumCompressedBytes(h); });
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getNumUncompressedBytesN__(JNIEnv*, jclass) {
    if (!openFileQueryReady()) {
        return 0;
    }
    return static_cast<jint>(Zel_Compress::GetNumUnCompressedBytes(Zel::FileDesc(fid)));
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getNumUncompressedBytesN___3B(JNIEnv* env, jclass,
                                                                                       jbyteArray header) {
    return queryHeader(env, header,
                       [](const unsigned char* h) { return Zel_Compress::GetNumUnCompressedBytes(h); });
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getNumHeaderBytesN(JNIEnv*, jclass) {
    if (!ensureCompressor()) {
        return 0;
    }
    return static_cast<jint>(Zel_Compress::GetNumHeaderBytes());
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getSizeofCompressedBuffer(JNIEnv*, jclass, jint size,
                                                                                   jboolean flag1,
                                                                                   jboolean flag2,
                                                                                   jboolean flag3) {
    const unsigned char f1 = flag1 == 1 ? 1 : 0;
    const unsigned char f2 = flag2 == 1 ? 1 : 0;
    const unsigned char f3 = flag3 == 1 ? 1 : 0;
    if (!ensureCompressor()) {
        return 0;
    }
    return static_cast<jint>(
        Zel_Compress::GetSizeofCompressedBuffer(static_cast<unsigned>(size), f1, f2, f3));
}

jint JNICALL Java_com_velmor_coreutil_toolkit_VelzipFile_getSizeofUnCompressedBuffer(JNIEnv* env, jclass,
                                                                                     jbyteArray header) {
    return queryHeader(env, header, [](const unsigned char* h) {
        return Zel_Compress::GetSizeofUnCompressedBuffer(h, 1, 1, 0);
    });
}

}  // extern "C"
