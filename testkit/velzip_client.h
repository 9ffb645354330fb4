// Calls the VelzipFile exports of libTessel_JNI.dll the way Java calls the native methods,
// through the JNI host: Java values are built and read back here, so the code that uses it
// reads like the Java caller and not like argument slots. It asserts nothing; results are
// handed back as they come.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "jnihost.h"

namespace testkit {

// The decorated export names (stdcall, argument bytes after the @).
namespace vz {
#define TESTKIT_VZ "_Java_com_velmor_coreutil_toolkit_VelzipFile_"
constexpr char kInitialize[] = TESTKIT_VZ "initialize@8";
constexpr char kOpen[] = TESTKIT_VZ "openFileN@16";
constexpr char kClose[] = TESTKIT_VZ "closeFileN@8";
constexpr char kErrorMsg[] = TESTKIT_VZ "getErrorMsgN@8";
constexpr char kErrorId[] = TESTKIT_VZ "getErrorIdN@8";
constexpr char kPrintLine[] = TESTKIT_VZ "printLineN@12";
constexpr char kWriteData[] = TESTKIT_VZ "writeDataN@16";
constexpr char kReadData[] = TESTKIT_VZ "readDataN@16";
constexpr char kReadLine[] = TESTKIT_VZ "readLineN@8";
constexpr char kEncode[] = TESTKIT_VZ "encodeMemN@24";
constexpr char kDecode[] = TESTKIT_VZ "decodeMemN@24";
constexpr char kIsZip[] = TESTKIT_VZ "isVelmorZipN@8";
constexpr char kIsEncrypted[] = TESTKIT_VZ "isVelmorEncryptedN@8";
constexpr char kCompressedOfFile[] = TESTKIT_VZ "getNumCompressedBytesN@8";
constexpr char kCompressedOfHeader[] = TESTKIT_VZ "getNumCompressedBytesN___3B@12";
constexpr char kUncompressedOfFile[] = TESTKIT_VZ "getNumUncompressedBytesN@8";
constexpr char kUncompressedOfHeader[] = TESTKIT_VZ "getNumUncompressedBytesN___3B@12";
constexpr char kHeaderBytes[] = TESTKIT_VZ "getNumHeaderBytesN@8";
constexpr char kSizeofCompressed[] = TESTKIT_VZ "getSizeofCompressedBuffer@24";
constexpr char kSizeofUnCompressed[] = TESTKIT_VZ "getSizeofUnCompressedBuffer@12";
#undef TESTKIT_VZ
}  // namespace vz

class VelzipClient {
public:
    using Bytes = std::vector<uint8_t>;

    VelzipClient(jnihost::Vm& vm, jnihost::Library& lib) : vm_(vm), lib_(lib) {}

    bool open(jstring path, jboolean forWrite) {
        return lib_.call<jboolean>(vz::kOpen, jclass{}, path, forWrite) == JNI_TRUE;
    }
    bool open(const std::string& utf8, jboolean forWrite) { return open(vm_.newStringUtf8(utf8), forWrite); }
    bool close() { return lib_.call<jboolean>(vz::kClose, jclass{}) == JNI_TRUE; }
    int errorId() { return lib_.call<jint>(vz::kErrorId, jclass{}); }
    std::optional<std::string> errorMsg() { return text(lib_.call<jstring>(vz::kErrorMsg, jclass{})); }

    bool printLine(jstring line) { return lib_.call<jboolean>(vz::kPrintLine, jclass{}, line) == JNI_TRUE; }
    bool printLine(const std::string& utf8) { return printLine(vm_.newStringUtf8(utf8)); }
    int writeData(jbyteArray data, jint length) {
        return lib_.call<jint>(vz::kWriteData, jclass{}, data, length);
    }
    int writeData(const Bytes& data, jint length) { return writeData(vm_.newByteArray(data), length); }
    int writeData(const Bytes& data) { return writeData(data, static_cast<jint>(data.size())); }
    int readData(jbyteArray buffer, jint length) {
        return lib_.call<jint>(vz::kReadData, jclass{}, buffer, length);
    }
    std::optional<std::string> readLine() { return text(lib_.call<jstring>(vz::kReadLine, jclass{})); }

    // readDataN in blocks until it gives 0 or less: everything read, and that last result.
    Bytes readAllData(jint block, int* last) {
        Bytes all;
        jbyteArray buffer = vm_.newByteArray(Bytes(block));
        int n;
        while ((n = readData(buffer, block)) > 0) {
            const Bytes got = vm_.byteArrayValue(buffer);
            all.insert(all.end(), got.begin(), got.begin() + n);
        }
        *last = n;
        return all;
    }

    int encode(jbyteArray dst, jint dstSize, jbyteArray src, jint srcSize) {
        return lib_.call<jint>(vz::kEncode, jclass{}, dst, dstSize, src, srcSize);
    }
    int decode(jbyteArray dst, jint dstSize, jbyteArray src, jint srcSize) {
        return lib_.call<jint>(vz::kDecode, jclass{}, dst, dstSize, src, srcSize);
    }
    // encodeMemN into the smallest destination it accepts; the compressed bytes.
    Bytes pack(const Bytes& data) {
        const jint bound = static_cast<jint>(data.size() * 1.01 + 36.0);
        jbyteArray dst = vm_.newByteArray(Bytes(bound));
        const int n = encode(dst, bound, vm_.newByteArray(data), static_cast<jint>(data.size()));
        Bytes out = vm_.byteArrayValue(dst);
        out.resize(n > 0 ? n : 0);
        return out;
    }

    // The methods without arguments, and those taking one byte array.
    int intCall(const char* name) { return lib_.call<jint>(name, jclass{}); }
    bool boolCall(const char* name) { return lib_.call<jboolean>(name, jclass{}) == JNI_TRUE; }
    int headerCall(const char* name, jbyteArray header) { return lib_.call<jint>(name, jclass{}, header); }
    int sizeofCompressed(jint size, jboolean f1, jboolean f2, jboolean f3) {
        return lib_.call<jint>(vz::kSizeofCompressed, jclass{}, size, f1, f2, f3);
    }

    // A Velzip file holding `content`, written through the exports; false when a step failed.
    bool writeFile(const std::string& utf8Path, const Bytes& content) {
        const bool ok = open(utf8Path, 1) && (content.empty() || writeData(content) == 1);
        return close() && ok;
    }

private:
    std::optional<std::string> text(jstring s) {
        return s == nullptr ? std::nullopt : std::optional<std::string>(vm_.stringUtf8(s));
    }

    jnihost::Vm& vm_;
    jnihost::Library& lib_;
};

}  // namespace testkit
