// VelzipFile: a Velzip file of lines and a block written and read back, a buffer compressed
// and decompressed in memory, and one failure as Java sees it.
#include <windows.h>

#include <cstdio>
#include <string>
#include <vector>

#include "tour.h"

namespace {

std::string name(const char* method) {
    return std::string("_Java_com_velmor_coreutil_toolkit_VelzipFile_") + method;
}

}  // namespace

void tourVelzip(jnihost::Vm& vm, jnihost::Library& lib) {
    std::printf("\nVelzipFile\n");
    wchar_t temp[MAX_PATH + 1];
    const DWORD n = GetTempPathW(MAX_PATH + 1, temp);
    const std::u16string path = std::u16string(temp, temp + n) + u"tessel-tour-\u00e9t\u00e9.vz";
    const std::string shown = jnihost::utf8(path);

    auto errorText = [&] {
        const jint id = lib.call<jint>(name("getErrorIdN@8").c_str(), jclass{});
        jstring msg = lib.call<jstring>(name("getErrorMsgN@8").c_str(), jclass{});
        return "id " + std::to_string(id) + ", \"" + (msg ? vm.stringUtf8(msg) : std::string("null")) + "\"";
    };

    // Write three lines and a block of 4096 bytes.
    const std::vector<std::string> lines = {"Velzip lines from Java\n", "caf\u00e9 \u65e5\u672c\n", "\n"};
    std::vector<uint8_t> block(4096);
    for (size_t i = 0; i < block.size(); ++i) {
        block[i] = static_cast<uint8_t>('a' + i % 26);
    }
    block.back() = '\n';
    jboolean opened =
        lib.call<jboolean>(name("openFileN@16").c_str(), jclass{}, vm.newString(path), jboolean{1});
    std::printf("  openFileN(\"%s\", write) -> %s\n", shown.c_str(), opened ? "true" : "false");
    for (const std::string& line : lines) {
        lib.call<jboolean>(name("printLineN@12").c_str(), jclass{}, vm.newStringUtf8(line));
    }
    const jint wrote =
        lib.call<jint>(name("writeDataN@16").c_str(), jclass{}, vm.newByteArray(block), jint{4096});
    const jint soFar = lib.call<jint>(name("getNumUncompressedBytesN@8").c_str(), jclass{});
    lib.call<jboolean>(name("closeFileN@8").c_str(), jclass{});
    std::printf("  printLineN x%u, writeDataN(4096 bytes) -> %d; %d bytes written\n",
                static_cast<unsigned>(lines.size()), static_cast<int>(wrote), static_cast<int>(soFar));

    // Read it back: lines first, then the block.
    opened = lib.call<jboolean>(name("openFileN@16").c_str(), jclass{}, vm.newString(path), jboolean{0});
    std::printf("  openFileN(read) -> %s; isVelmorZipN %s, isVelmorEncryptedN %s, %d -> %d bytes\n",
                opened ? "true" : "false",
                lib.call<jboolean>(name("isVelmorZipN@8").c_str(), jclass{}) ? "true" : "false",
                lib.call<jboolean>(name("isVelmorEncryptedN@8").c_str(), jclass{}) ? "true" : "false",
                static_cast<int>(lib.call<jint>(name("getNumUncompressedBytesN@8").c_str(), jclass{})),
                static_cast<int>(lib.call<jint>(name("getNumCompressedBytesN@8").c_str(), jclass{})));
    for (size_t i = 0; i < lines.size(); ++i) {
        jstring line = lib.call<jstring>(name("readLineN@8").c_str(), jclass{});
        std::string text = line ? vm.stringUtf8(line) : "null";
        if (!text.empty() && text.back() == '\n') {
            text = text.substr(0, text.size() - 1) + "\\n";
        }
        std::printf("  readLineN() -> \"%s\"\n", text.c_str());
    }
    jbyteArray buffer = vm.newByteArray(std::vector<uint8_t>(8192));
    size_t total = 0;
    jint got;
    while ((got = lib.call<jint>(name("readDataN@16").c_str(), jclass{}, buffer, jint{8192})) > 0) {
        total += static_cast<size_t>(got);
    }
    std::printf("  readDataN until 0 -> %u bytes back (the block reads as one line: it ends in \\n)\n",
                static_cast<unsigned>(total));
    lib.call<jboolean>(name("closeFileN@8").c_str(), jclass{});
    DeleteFileW(reinterpret_cast<const wchar_t*>(path.c_str()));

    // In memory: compress a text buffer and back.
    std::string text;
    while (text.size() < 100000) {
        text += "The Velzip container holds a header and a zlib body. ";
    }
    const jint srcSize = static_cast<jint>(text.size());
    const jint dstSize = static_cast<jint>(srcSize * 1.01 + 36.0);
    jbyteArray packed = vm.newByteArray(std::vector<uint8_t>(dstSize));
    const jint packedSize =
        lib.call<jint>(name("encodeMemN@24").c_str(), jclass{}, packed, dstSize,
                       vm.newByteArray(std::vector<uint8_t>(text.begin(), text.end())), srcSize);
    std::printf(
        "  encodeMemN(%d bytes) -> %d bytes, ratio %.1f : 1; header %d bytes says %d -> %d\n",
        static_cast<int>(srcSize), static_cast<int>(packedSize),
        packedSize > 0 ? static_cast<double>(srcSize) / packedSize : 0.0,
        static_cast<int>(lib.call<jint>(name("getNumHeaderBytesN@8").c_str(), jclass{})),
        static_cast<int>(lib.call<jint>(name("getNumUncompressedBytesN___3B@12").c_str(), jclass{}, packed)),
        static_cast<int>(lib.call<jint>(name("getNumCompressedBytesN___3B@12").c_str(), jclass{}, packed)));
    jbyteArray back = vm.newByteArray(std::vector<uint8_t>(srcSize));
    const jint backSize =
        lib.call<jint>(name("decodeMemN@24").c_str(), jclass{}, back, srcSize, packed, packedSize);
    const std::vector<uint8_t> backBytes = vm.byteArrayValue(back);
    std::printf("  decodeMemN -> %d bytes, %s\n", static_cast<int>(backSize),
                std::string(backBytes.begin(), backBytes.end()) == text ? "identical" : "DIFFERENT");

    // A refused size, as Java sees it.
    lib.call<jint>(name("encodeMemN@24").c_str(), jclass{}, packed, jint{136}, packed, jint{100});
    std::printf("  encodeMemN(dstSize 136, srcSize 100) -> refused: %s\n", errorText().c_str());
}
