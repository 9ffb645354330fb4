// VelzipFile through the JNI host and the real exports, with the stand-in
// libZelbrin.dll underneath. The test links libZelbrin.dll too, so it reads the same
// library's log of interface calls (ZelTest_*).
#include <windows.h>

#include <climits>
#include <cmath>
#include <cstring>
#include <optional>
#include <string>
#include <vector>

#include "host_fixture.h"
#include "temp_folder.h"
#include "velzip/size_bounds.h"
#include "zelbrin.h"

namespace {

#define VZ "_Java_com_velmor_coreutil_toolkit_VelzipFile_"
const char kInitialize[] = VZ "initialize@8";
const char kOpen[] = VZ "openFileN@16";
const char kClose[] = VZ "closeFileN@8";
const char kErrorMsg[] = VZ "getErrorMsgN@8";
const char kErrorId[] = VZ "getErrorIdN@8";
const char kPrintLine[] = VZ "printLineN@12";
const char kWriteData[] = VZ "writeDataN@16";
const char kReadData[] = VZ "readDataN@16";
const char kReadLine[] = VZ "readLineN@8";
const char kEncode[] = VZ "encodeMemN@24";
const char kDecode[] = VZ "decodeMemN@24";
const char kIsZip[] = VZ "isVelmorZipN@8";
const char kIsEncrypted[] = VZ "isVelmorEncryptedN@8";
const char kCompressedOfFile[] = VZ "getNumCompressedBytesN@8";
const char kCompressedOfHeader[] = VZ "getNumCompressedBytesN___3B@12";
const char kUncompressedOfFile[] = VZ "getNumUncompressedBytesN@8";
const char kUncompressedOfHeader[] = VZ "getNumUncompressedBytesN___3B@12";
const char kHeaderBytes[] = VZ "getNumHeaderBytesN@8";
const char kSizeofCompressed[] = VZ "getSizeofCompressedBuffer@24";
const char kSizeofUnCompressed[] = VZ "getSizeofUnCompressedBuffer@12";

using Bytes = std::vector<uint8_t>;
using testfs::sampleData;

Bytes bytes(const std::string& s) {
    return Bytes(s.begin(), s.end());
}

class Velzip : public HostTest {
protected:
    ~Velzip() override { ZelTest_EndLog(); }

    // ---- Calls ----
    bool open(const std::string& pathUtf8, jboolean forWrite) {
        return lib.call<jboolean>(kOpen, jclass{}, vm.newStringUtf8(pathUtf8), forWrite) == JNI_TRUE;
    }
    bool openJava(jstring path, jboolean forWrite) {
        return lib.call<jboolean>(kOpen, jclass{}, path, forWrite);
    }
    bool close() { return lib.call<jboolean>(kClose, jclass{}) == JNI_TRUE; }
    int errorId() { return lib.call<jint>(kErrorId, jclass{}); }
    std::optional<std::string> errorMsg() {
        jstring s = lib.call<jstring>(kErrorMsg, jclass{});
        if (s == nullptr) {
            return std::nullopt;
        }
        return vm.stringUtf8(s);
    }
    bool printLine(const std::string& utf8) {
        return lib.call<jboolean>(kPrintLine, jclass{}, vm.newStringUtf8(utf8)) == JNI_TRUE;
    }
    int writeData(const Bytes& data, jint length) {
        return lib.call<jint>(kWriteData, jclass{}, vm.newByteArray(data), length);
    }
    int writeData(const Bytes& data) { return writeData(data, static_cast<jint>(data.size())); }
    std::optional<std::string> readLine() {
        jstring s = lib.call<jstring>(kReadLine, jclass{});
        if (s == nullptr) {
            return std::nullopt;
        }
        return vm.stringUtf8(s);
    }
    // Reads blocks until readDataN gives 0 or less; the last result in *last.
    Bytes readAllData(jint block, int* last, int* calls = nullptr) {
        Bytes all;
        jbyteArray buffer = vm.newByteArray(Bytes(block));
        int n;
        int count = 0;
        while ((n = lib.call<jint>(kReadData, jclass{}, buffer, block)) > 0) {
            const Bytes got = vm.byteArrayValue(buffer);
            all.insert(all.end(), got.begin(), got.begin() + n);
            ++count;
        }
        *last = n;
        if (calls != nullptr) {
            *calls = count;
        }
        return all;
    }
    int encode(jbyteArray dst, jint dstSize, jbyteArray src, jint srcSize) {
        return lib.call<jint>(kEncode, jclass{}, dst, dstSize, src, srcSize);
    }
    int decode(jbyteArray dst, jint dstSize, jbyteArray src, jint srcSize) {
        return lib.call<jint>(kDecode, jclass{}, dst, dstSize, src, srcSize);
    }
    int intCall(const char* name) { return lib.call<jint>(name, jclass{}); }
    bool boolCall(const char* name) { return lib.call<jboolean>(name, jclass{}) == JNI_TRUE; }
    int headerCall(const char* name, jbyteArray header) { return lib.call<jint>(name, jclass{}, header); }

    // ---- Files ----
    // A Velzip file of the given content, made through the library itself.
    std::string makeFile(const std::string& name, const Bytes& content) {
        const std::string path = dir.file(name);
        EXPECT_TRUE(open(path, 1));
        if (!content.empty()) {
            EXPECT_EQ(writeData(content), 1);
        }
        EXPECT_TRUE(close());
        return path;
    }

    // Compresses with the library's codec; the Velzip buffer.
    Bytes packed(const Bytes& data) {
        const jint bound = static_cast<jint>(data.size() * 1.01 + 36.0);
        jbyteArray dst = vm.newByteArray(Bytes(bound));
        const int n = encode(dst, bound, vm.newByteArray(data), static_cast<jint>(data.size()));
        Bytes out = vm.byteArrayValue(dst);
        out.resize(n);
        return out;
    }

    std::string log() { return ZelTest_Log(); }

    testfs::TempFolder dir;
};

// ======================= File state =======================

using VelzipFileState = Velzip;

TEST_F(VelzipFileState, AtLoadNothingIsRecordedAndInitializeCallsNothing) {
    EXPECT_EQ(errorId(), 0);
    EXPECT_EQ(errorMsg(), std::nullopt);
    ZelTest_BeginLog();
    lib.call<void>(kInitialize, jclass{});
    EXPECT_EQ(log(), "");
    EXPECT_EQ(errorId(), 0);
}

TEST(VelzipLoad, FileInitIsMadeAtLoadAndDestroyedAtUnload) {
    ASSERT_EQ(ZelTest_LiveFileInits(), 0);
    {
        jnihost::Vm vm;
        jnihost::Library lib(vm);
        ASSERT_NE(lib.handle(), nullptr);
        EXPECT_EQ(ZelTest_LiveFileInits(), 1);
    }
    EXPECT_EQ(ZelTest_LiveFileInits(), 0);
}

TEST_F(VelzipFileState, NullPathGivesId1EndingWithLineFeed) {
    ZelTest_BeginLog();
    EXPECT_FALSE(openJava(nullptr, 0));
    EXPECT_EQ(errorId(), 1);
    EXPECT_EQ(errorMsg(), "NULL file path detected.\n");
    EXPECT_EQ(log(), "");
    EXPECT_EQ(vm.callCount("GetStringUTFChars"), 0);
}

TEST_F(VelzipFileState, EmptyPathGivesId2EndingWithLineFeed) {
    ZelTest_BeginLog();
    EXPECT_FALSE(open("", 1));
    EXPECT_EQ(errorId(), 2);
    EXPECT_EQ(errorMsg(), "File path is the empty string.\n");
    EXPECT_EQ(log(), "");
}

TEST_F(VelzipFileState, MissingFileForReadingGivesId5BeforeReadability) {
    const std::string path = dir.file("missing.vz");
    ZelTest_BeginLog();
    EXPECT_FALSE(open(path, 0));
    EXPECT_EQ(errorId(), 5);
    EXPECT_EQ(errorMsg(), "File " + path + " does not exist.");
    EXPECT_EQ(log(), "exist velform");
}

TEST_F(VelzipFileState, UnreadableFileGivesId4) {
    const std::string path = makeFile("held.vz", bytes("x\n"));
    HANDLE h = CreateFileW(dir.wfile("held.vz").c_str(), GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr);
    ASSERT_NE(h, INVALID_HANDLE_VALUE);
    ZelTest_BeginLog();
    EXPECT_FALSE(open(path, 0));
    CloseHandle(h);
    EXPECT_EQ(errorId(), 4);
    EXPECT_EQ(errorMsg(), "File " + path + " does not have read permissions.");
    EXPECT_EQ(log(), "exist canread velform");
}

TEST_F(VelzipFileState, FileThatIsNotVelzipGivesId3) {
    ASSERT_TRUE(testfs::writeAll(dir.wfile("plain.txt"), bytes("just text\n")));
    const std::string path = dir.file("plain.txt");
    ZelTest_BeginLog();
    EXPECT_FALSE(open(path, 0));
    EXPECT_EQ(errorId(), 3);
    EXPECT_EQ(errorMsg(), "Failure to open file " + path + " for read.");
    EXPECT_EQ(log(), "exist canread open(1,1) velform");
    EXPECT_EQ(ZelTest_LiveStreams(), 0);
}

TEST_F(VelzipFileState, PathInMissingFolderGivesId7WithoutExistenceTest) {
    const std::string path = dir.file("no-folder\\new.vz");
    ZelTest_BeginLog();
    EXPECT_FALSE(open(path, 1));
    EXPECT_EQ(errorId(), 7);
    EXPECT_EQ(errorMsg(), "Cannot write to file " + path + ".");
    EXPECT_EQ(log(), "canwrite velform");
}

TEST_F(VelzipFileState, FileBeingWrittenElsewhereGivesId6) {
    const std::string path = makeFile("busy.vz", bytes("x"));
    HANDLE h = CreateFileW(dir.wfile("busy.vz").c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                           nullptr, OPEN_EXISTING, 0, nullptr);
    ASSERT_NE(h, INVALID_HANDLE_VALUE);
    ZelTest_BeginLog();
    EXPECT_FALSE(open(path, 1));
    CloseHandle(h);
    EXPECT_EQ(errorId(), 6);
    EXPECT_EQ(errorMsg(), "Failure to open file " + path + " for write.");
    EXPECT_EQ(log(), "canwrite open(170,1) velform");
}

TEST_F(VelzipFileState, NewFileOpensForWritingAndClearsTheRecord) {
    EXPECT_FALSE(open("", 0));
    ASSERT_EQ(errorId(), 2);
    const std::string path = dir.file("new.vz");
    ZelTest_BeginLog();
    EXPECT_TRUE(open(path, 1));
    EXPECT_EQ(log(), "canwrite open(170,1) getfid");
    EXPECT_EQ(errorId(), 0);
    EXPECT_EQ(errorMsg(), std::nullopt);
    EXPECT_TRUE(testfs::exists(dir.wfile("new.vz")));
    EXPECT_TRUE(close());
}

TEST_F(VelzipFileState, ExistingFileOpensForReading) {
    const std::string path = makeFile("r.vz", bytes("line\n"));
    ZelTest_BeginLog();
    EXPECT_TRUE(open(path, 0));
    EXPECT_EQ(log(), "exist canread open(1,1) getfid");
    EXPECT_EQ(errorId(), 0);
}

TEST_F(VelzipFileState, ForWriteOtherThanOneOpensForReading) {
    const std::string path = makeFile("r.vz", bytes("line\n"));
    for (jboolean value : {jboolean{2}, jboolean{0xFF}}) {
        EXPECT_TRUE(open(path, value));
        EXPECT_EQ(readLine(), "line\n");
        EXPECT_FALSE(printLine("x"));
        EXPECT_EQ(errorId(), 8);
        EXPECT_TRUE(close());
    }
}

TEST_F(VelzipFileState, FailureStaysReadableAfterSuccessesUntilTheNextOpen) {
    const std::string path = makeFile("r.vz", bytes("a\nb\n"));
    ASSERT_TRUE(open(path, 0));
    EXPECT_FALSE(printLine("x"));
    ASSERT_EQ(errorId(), 8);
    EXPECT_EQ(readLine(), "a\n");
    EXPECT_EQ(intCall(kHeaderBytes), 16);
    EXPECT_TRUE(boolCall(kIsZip));
    EXPECT_EQ(errorId(), 8);
    EXPECT_EQ(errorMsg(), "Output stream has not been initialized.");
    EXPECT_TRUE(close());
    EXPECT_EQ(errorId(), 8) << "closing keeps the record";
    EXPECT_TRUE(open(path, 0));
    EXPECT_EQ(errorId(), 0);
    EXPECT_EQ(errorMsg(), std::nullopt);
}

TEST_F(VelzipFileState, CloseWithNothingOpenCallsNothing) {
    ZelTest_BeginLog();
    EXPECT_TRUE(close());
    EXPECT_TRUE(close());
    EXPECT_EQ(log(), "");
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    ZelTest_BeginLog();
    EXPECT_TRUE(close());
    EXPECT_TRUE(close());
    EXPECT_EQ(log(), "close") << "only the first close has a stream to close";
}

TEST_F(VelzipFileState, WithoutAFileTheOperationsReport8Or9) {
    const std::string noOut = "Output stream has not been initialized.";
    const std::string noIn = "Input stream has not been initialized.";
    for (int round = 0; round < 2; ++round) {
        if (round == 1) {
            ASSERT_TRUE(open(dir.file("w.vz"), 1));
            ASSERT_TRUE(close());
        }
        ZelTest_BeginLog();
        EXPECT_FALSE(printLine("x"));
        EXPECT_EQ(errorId(), 8);
        EXPECT_EQ(errorMsg(), noOut);
        EXPECT_EQ(writeData(bytes("abc")), -1);
        EXPECT_EQ(errorId(), 8);
        EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, vm.newByteArray(Bytes(4)), jint{4}), -1);
        EXPECT_EQ(errorId(), 9);
        EXPECT_EQ(errorMsg(), noIn);
        EXPECT_FALSE(printLine("x"));
        EXPECT_EQ(readLine(), std::nullopt);
        EXPECT_EQ(errorId(), 9);
        EXPECT_FALSE(printLine("x"));
        EXPECT_FALSE(boolCall(kIsZip));
        EXPECT_EQ(errorId(), 9);
        EXPECT_FALSE(printLine("x"));
        EXPECT_FALSE(boolCall(kIsEncrypted));
        EXPECT_EQ(errorId(), 9);
        EXPECT_FALSE(printLine("x"));
        EXPECT_EQ(intCall(kCompressedOfFile), 0);
        EXPECT_EQ(errorId(), 9);
        EXPECT_FALSE(printLine("x"));
        EXPECT_EQ(intCall(kUncompressedOfFile), 0);
        EXPECT_EQ(errorId(), 9);
        EXPECT_EQ(log(), "") << "nothing reaches the library";
    }
}

TEST_F(VelzipFileState, SecondOpenClosesTheFirstFileCompletingIt) {
    const std::string first = dir.file("first.vz");
    ASSERT_TRUE(open(first, 1));
    ASSERT_TRUE(printLine("kept line\n"));
    ZelTest_BeginLog();
    ASSERT_TRUE(open(dir.file("second.vz"), 1));
    EXPECT_EQ(log(), "close canwrite open(170,1) getfid");
    EXPECT_EQ(ZelTest_LiveStreams(), 1) << "the earlier stream is not leaked";
    ASSERT_TRUE(open(first, 0));
    EXPECT_EQ(ZelTest_LiveStreams(), 1);
    EXPECT_EQ(readLine(), "kept line\n") << "the unflushed data reached the file";
    EXPECT_EQ(readLine(), std::nullopt);
    EXPECT_EQ(errorId(), 0);
}

TEST_F(VelzipFileState, FailedOpenEndsWithNoFile) {
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    EXPECT_FALSE(open(dir.file("missing.vz"), 0));
    EXPECT_EQ(ZelTest_LiveStreams(), 0);
    EXPECT_FALSE(printLine("x"));
    EXPECT_EQ(errorId(), 8);
}

TEST_F(VelzipFileState, NamesOutsideTheAnsiCodePageCrossAsModifiedUtf8) {
    const std::u16string name = u"\u65e5\u672c-\u00e9-\U0001F600.vz";
    const std::u16string path = jnihost::utf16(dir.path()) + u"\\" + name;
    ASSERT_TRUE(openJava(vm.newString(path), 1));
    ASSERT_TRUE(printLine("\u00e9t\u00e9\n"));
    ASSERT_TRUE(close());
    EXPECT_TRUE(testfs::exists(dir.wpath() + L"\\\u65e5\u672c-\u00e9-\U0001F600.vz"));
    ASSERT_TRUE(openJava(vm.newString(path), 0));
    EXPECT_EQ(readLine(), "\u00e9t\u00e9\n");

    const std::u16string missing = jnihost::utf16(dir.path()) + u"\\\U0001F600-missing.vz";
    EXPECT_FALSE(openJava(vm.newString(missing), 0));
    EXPECT_EQ(errorId(), 5);
    EXPECT_EQ(errorMsg(), "File " + jnihost::utf8(missing) + " does not exist.")
        << "the path comes back whole through velform and NewStringUTF";
}

TEST_F(VelzipFileState, LongPathIsFormattedWhole) {
    const std::string path = dir.file(std::string(5000, 'n') + ".vz");
    EXPECT_FALSE(open(path, 0));
    EXPECT_EQ(errorId(), 5);
    EXPECT_EQ(errorMsg(), "File " + path + " does not exist.");
}

TEST(VelzipLoad, FileLeftOpenIsCompletedWhenTheLibraryUnloads) {
    testfs::TempFolder dir;
    const std::string path = dir.file("left.vz");
    {
        jnihost::Vm vm;
        jnihost::Library lib(vm);
        ASSERT_TRUE(lib.call<jboolean>(kOpen, jclass{}, vm.newStringUtf8(path), jboolean{1}));
        ASSERT_TRUE(lib.call<jboolean>(kPrintLine, jclass{}, vm.newStringUtf8("tail\n")));
    }  // unloading destroys fileInit; the library's tear-down completes the file
    EXPECT_EQ(ZelTest_LiveStreams(), 0);
    jnihost::Vm vm;
    jnihost::Library lib(vm);
    ASSERT_TRUE(lib.call<jboolean>(kOpen, jclass{}, vm.newStringUtf8(path), jboolean{0}));
    jstring line = lib.call<jstring>(kReadLine, jclass{});
    ASSERT_NE(line, nullptr);
    EXPECT_EQ(vm.stringUtf8(line), "tail\n");
    lib.call<jboolean>(kClose, jclass{});
}

// ======================= Stream I/O =======================

using VelzipStreamIo = Velzip;

TEST_F(VelzipStreamIo, LinesRoundTripOnePerRead) {
    const std::string full(2046, 'w');  // 2046 + line feed: the longest line readLineN takes whole
    const std::vector<std::string> lines = {"abc\n", "\n", full + "\n", "caf\u00e9 \u65e5\u672c \U0001F600\n",
                                            "last, without line feed"};
    ASSERT_TRUE(open(dir.file("lines.vz"), 1));
    for (const std::string& line : lines) {
        EXPECT_TRUE(printLine(line));
    }
    ASSERT_TRUE(close());
    ASSERT_TRUE(open(dir.file("lines.vz"), 0));
    for (const std::string& line : lines) {
        EXPECT_EQ(readLine(), line);
    }
    EXPECT_EQ(readLine(), std::nullopt);
    EXPECT_EQ(readLine(), std::nullopt);
    EXPECT_EQ(errorId(), 0) << "the end of the data is no failure";
}

TEST_F(VelzipStreamIo, LongerLineComesInPiecesOf2047Bytes) {
    const std::string line = std::string(3000, 'z') + "\n";
    ASSERT_TRUE(open(dir.file("long.vz"), 1));
    ASSERT_TRUE(printLine(line));
    ASSERT_TRUE(close());
    ASSERT_TRUE(open(dir.file("long.vz"), 0));
    EXPECT_EQ(readLine(), line.substr(0, 2047));
    EXPECT_EQ(readLine(), line.substr(2047));
    EXPECT_EQ(readLine(), std::nullopt);
    EXPECT_EQ(errorId(), 0);
}

TEST_F(VelzipStreamIo, PrintLineWritesExactlyTheStringsBytes) {
    ASSERT_TRUE(open(dir.file("abc.vz"), 1));
    ZelTest_BeginLog();
    EXPECT_TRUE(printLine("abc"));
    EXPECT_EQ(log(), "write geterror") << "one write, then its error";
    EXPECT_TRUE(printLine(""));
    EXPECT_EQ(intCall(kUncompressedOfFile), 3) << "no line feed added; the empty string writes nothing";
    ASSERT_TRUE(close());
    ASSERT_TRUE(open(dir.file("abc.vz"), 0));
    EXPECT_EQ(readLine(), "abc");
}

TEST_F(VelzipStreamIo, ZeroByteInALine) {
    // A Java NUL crosses as modified UTF-8 (C0 80) and comes back; a raw zero byte in the file
    // ends the string.
    ASSERT_TRUE(open(dir.file("zero.vz"), 1));
    ASSERT_TRUE(lib.call<jboolean>(kPrintLine, jclass{}, vm.newString(std::u16string(u"ab\0cd\n", 6))));
    ASSERT_EQ(writeData(Bytes{'x', 'y', 0, 'z', '\n'}), 1);
    ASSERT_TRUE(close());
    ASSERT_TRUE(open(dir.file("zero.vz"), 0));
    jstring first = lib.call<jstring>(kReadLine, jclass{});
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(vm.stringValue(first), std::u16string(u"ab\0cd\n", 6));
    EXPECT_EQ(readLine(), "xy");
    EXPECT_EQ(readLine(), std::nullopt);
}

TEST_F(VelzipStreamIo, BlocksRoundTrip) {
    const Bytes data = sampleData(1 << 20, false);
    ASSERT_TRUE(open(dir.file("blocks.vz"), 1));
    size_t at = 0;
    for (size_t size : {size_t{0}, size_t{1}, size_t{65536}, size_t{100000}, size_t{65536}}) {
        EXPECT_EQ(writeData(Bytes(data.begin() + at, data.begin() + at + size)), 1);
        at += size;
    }
    // A length shorter than the array writes only that many bytes.
    Bytes longer(data.begin() + at, data.begin() + at + 5000);
    EXPECT_EQ(writeData(longer, 1000), 1);
    at += 1000;
    ASSERT_TRUE(close());

    ASSERT_TRUE(open(dir.file("blocks.vz"), 0));
    int last = 0;
    EXPECT_EQ(readAllData(65536, &last), Bytes(data.begin(), data.begin() + at));
    EXPECT_EQ(last, 0);
    EXPECT_EQ(errorId(), 0) << "the end gives 0 with nothing recorded";
}

TEST_F(VelzipStreamIo, EachBlockCallMakesOneLibraryCall) {
    ASSERT_TRUE(open(dir.file("one.vz"), 1));
    ZelTest_BeginLog();
    EXPECT_EQ(writeData(bytes("12345")), 1);
    EXPECT_EQ(log(), "write geterror");
    ASSERT_TRUE(close());
    ASSERT_TRUE(open(dir.file("one.vz"), 0));
    ZelTest_BeginLog();
    jbyteArray buffer = vm.newByteArray(Bytes(10, 0x55));
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, buffer, jint{10}), 5);
    EXPECT_EQ(log(), "read geterror");
    EXPECT_EQ(vm.byteArrayValue(buffer), (Bytes{'1', '2', '3', '4', '5', 0x55, 0x55, 0x55, 0x55, 0x55}));
}

TEST_F(VelzipStreamIo, FailedPrintLineRecords12WithTheNumber) {
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    ZelTest_FailWrites(Zel::ErrWrite);
    EXPECT_FALSE(printLine("x\n"));
    ZelTest_FailWrites(0);
    EXPECT_EQ(errorId(), 12);
    EXPECT_EQ(errorMsg(), "Error writing encoded output file: 2");
}

TEST_F(VelzipStreamIo, FailedBlockWriteGivesZeroAndRecordsNothing) {
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    ZelTest_FailWrites(Zel::ErrWrite);
    EXPECT_EQ(writeData(bytes("abc")), 0);
    ZelTest_FailWrites(0);
    EXPECT_EQ(errorId(), 0);
    EXPECT_FALSE(printLine("later\n"));
    EXPECT_EQ(errorId(), 12);
    EXPECT_EQ(writeData(bytes("abc")), 0);
    EXPECT_EQ(errorId(), 12) << "still the earlier record";
    EXPECT_EQ(errorMsg(), "Error writing encoded output file: 2");
}

TEST_F(VelzipStreamIo, TruncatedFileFailsReadDataWith13) {
    const Bytes data = sampleData(100000, true);
    makeFile("good.vz", data);
    Bytes file = testfs::readAll(dir.wfile("good.vz"));
    file.resize(file.size() / 2);
    ASSERT_TRUE(testfs::writeAll(dir.wfile("cut.vz"), file));
    ASSERT_TRUE(open(dir.file("cut.vz"), 0));
    int last = 1;
    const Bytes got = readAllData(65536, &last);
    EXPECT_EQ(last, 0);
    EXPECT_EQ(errorId(), 13);
    EXPECT_EQ(errorMsg(), "Error: 5 reading encoded input file.");
    EXPECT_TRUE(std::equal(got.begin(), got.end(), data.begin()));
}

TEST_F(VelzipStreamIo, FailedReadCopiesNothing) {
    makeFile("good.vz", sampleData(1000, false));
    Bytes file = testfs::readAll(dir.wfile("good.vz"));
    file[file.size() / 2] ^= 0xFF;
    ASSERT_TRUE(testfs::writeAll(dir.wfile("bad.vz"), file));
    ASSERT_TRUE(open(dir.file("bad.vz"), 0));
    jbyteArray buffer = vm.newByteArray(Bytes(4096, 0x55));
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, buffer, jint{4096}), 0);
    EXPECT_EQ(errorId(), 13);
    EXPECT_EQ(vm.byteArrayValue(buffer), Bytes(4096, 0x55)) << "the library's -1 copies nothing";
    EXPECT_EQ(vm.callCount("SetByteArrayRegion"), 0);
}

TEST_F(VelzipStreamIo, ReadLineOnADamagedFileEndsLikeTheEnd) {
    // readLineN stops at a count of 0 or less before asking geterror, so a
    // damaged body looks like the end to it; readDataN then tells.
    const std::string text = "one\ntwo\n" + std::string(50000, 'q');
    makeFile("good.vz", bytes(text));
    Bytes file = testfs::readAll(dir.wfile("good.vz"));
    file.resize(file.size() - 4);
    ASSERT_TRUE(testfs::writeAll(dir.wfile("cut.vz"), file));
    ASSERT_TRUE(open(dir.file("cut.vz"), 0));
    std::optional<std::string> line;
    int count = 0;
    while ((line = readLine()) && count < 100) {
        ++count;
    }
    EXPECT_EQ(errorId(), 0);
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, vm.newByteArray(Bytes(8)), jint{8}), 0);
    EXPECT_EQ(errorId(), 13);
}

TEST_F(VelzipStreamIo, BadBlockArgumentsAreRefusedWith14BeforeAnyAccess) {
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    ZelTest_BeginLog();
    vm.resetCallCounts();
    EXPECT_EQ(lib.call<jint>(kWriteData, jclass{}, jbyteArray{}, jint{0}), 0);
    EXPECT_EQ(errorId(), 14);
    EXPECT_EQ(errorMsg(), "Incorrect buffer sizes specified.");
    EXPECT_EQ(writeData(bytes("abc"), -1), 0);
    EXPECT_EQ(writeData(bytes("abc"), 4), 0);
    EXPECT_EQ(writeData(bytes("abc"), INT_MAX), 0);
    EXPECT_EQ(log(), "") << "nothing written";
    EXPECT_EQ(vm.callCount("GetByteArrayElements"), 0);
    EXPECT_EQ(writeData(bytes("abc"), 3), 1);
    ASSERT_TRUE(close());

    ASSERT_TRUE(open(dir.file("w.vz"), 0));
    ZelTest_BeginLog();
    vm.resetCallCounts();
    jbyteArray buffer = vm.newByteArray(Bytes(3, 0x55));
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, jbyteArray{}, jint{3}), 0);
    EXPECT_EQ(errorId(), 14);
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, buffer, jint{-1}), 0);
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, buffer, jint{4}), 0);
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, buffer, jint{INT_MIN}), 0);
    EXPECT_EQ(log(), "") << "nothing read";
    EXPECT_EQ(vm.callCount("SetByteArrayRegion"), 0);
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, buffer, jint{3}), 3);
    EXPECT_EQ(vm.byteArrayValue(buffer), bytes("abc")) << "the data is still all there";
}

TEST_F(VelzipStreamIo, StreamCheckComesBeforeTheArgumentCheck) {
    EXPECT_EQ(lib.call<jint>(kWriteData, jclass{}, jbyteArray{}, jint{-1}), -1);
    EXPECT_EQ(errorId(), 8);
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, jbyteArray{}, jint{-1}), -1);
    EXPECT_EQ(errorId(), 9);
}

TEST_F(VelzipStreamIo, PrintLineOfNullWritesNothing) {
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    ZelTest_BeginLog();
    vm.resetCallCounts();
    EXPECT_EQ(lib.call<jboolean>(kPrintLine, jclass{}, jstring{}), JNI_FALSE);
    EXPECT_EQ(log(), "");
    EXPECT_EQ(errorId(), 0);
    EXPECT_EQ(vm.callCount("GetStringUTFChars"), 0);
}

TEST_F(VelzipStreamIo, ZeroLengthBlockCalls) {
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    EXPECT_EQ(writeData(Bytes{}, 0), 1);
    ASSERT_TRUE(close());
    ASSERT_TRUE(open(dir.file("w.vz"), 0));
    EXPECT_EQ(lib.call<jint>(kReadData, jclass{}, vm.newByteArray(Bytes{}), jint{0}), 0);
    EXPECT_EQ(errorId(), 0);
}

// ======================= Memory codec and header queries =======================

using VelzipCodec = Velzip;

TEST_F(VelzipCodec, BuffersRoundTrip) {
    for (size_t size : {size_t{0}, size_t{1}, size_t{100}, size_t{70000}, size_t{2 << 20}}) {
        for (bool text : {true, false}) {
            const Bytes data = sampleData(size, text);
            const Bytes pack = packed(data);
            ASSERT_GT(pack.size(), 16u) << size;
            // decodeMemN wants dstSize >= srcSize * 1.01 + 36 as well.
            const size_t dstSize = std::max<size_t>(size, pack.size() * 1.01 + 37);
            jbyteArray dst = vm.newByteArray(Bytes(dstSize));
            EXPECT_EQ(decode(dst, static_cast<jint>(dstSize), vm.newByteArray(pack),
                             static_cast<jint>(pack.size())),
                      static_cast<int>(size));
            Bytes back = vm.byteArrayValue(dst);
            back.resize(size);
            EXPECT_EQ(back, data) << size;
        }
    }
    EXPECT_EQ(errorId(), 0);
}

TEST_F(VelzipCodec, EncodeBoundAtItsExactEdges) {
    const Bytes src = sampleData(1024, true);
    struct Edge {
        jint srcSize, accepted;
    };
    for (Edge e : {Edge{100, 137}, Edge{0, 36}, Edge{1024, 1070}, Edge{1, 37}}) {
        jbyteArray dst = vm.newByteArray(Bytes(2000));
        ZelTest_BeginLog();
        EXPECT_GT(encode(dst, e.accepted, vm.newByteArray(src), e.srcSize), 0) << e.srcSize;
        EXPECT_NE(log().find("Compress"), std::string::npos);
        EXPECT_NE(errorId(), 14);

        ZelTest_BeginLog();
        EXPECT_EQ(encode(dst, e.accepted - 1, vm.newByteArray(src), e.srcSize), 0) << e.srcSize;
        EXPECT_EQ(errorId(), 14);
        EXPECT_EQ(errorMsg(), "Incorrect buffer sizes specified.");
        EXPECT_EQ(log(), "");
        ASSERT_TRUE(open(dir.file("reset.vz"), 1));  // clears the record
        ASSERT_TRUE(close());
    }
}

TEST_F(VelzipCodec, DecodeBoundAtItsExactEdges) {
    struct Edge {
        jint srcSize, accepted;
    };
    // 137 for 100 is the one that x87 arithmetic would get wrong.
    for (Edge e : {Edge{1024, 1071}, Edge{100, 137}, Edge{1, 38}, Edge{0, 35}}) {
        jbyteArray dst = vm.newByteArray(Bytes(2000));
        jbyteArray src = vm.newByteArray(Bytes(1024));
        ZelTest_BeginLog();
        EXPECT_EQ(decode(dst, e.accepted, src, e.srcSize), 0) << "not a Velzip buffer";
        EXPECT_NE(log().find("UnCompress"), std::string::npos) << e.srcSize << " accepts " << e.accepted;
        EXPECT_EQ(errorId(), 0);

        ZelTest_BeginLog();
        EXPECT_EQ(decode(dst, e.accepted - 1, src, e.srcSize), 0);
        EXPECT_EQ(errorId(), 14) << e.srcSize << " refuses " << e.accepted - 1;
        EXPECT_EQ(log(), "");
        ASSERT_TRUE(open(dir.file("reset.vz"), 1));
        ASSERT_TRUE(close());
    }
}

TEST_F(VelzipCodec, SizeFailureTakesNothingAndMakesNoCompressor) {
    const int before = ZelTest_CompressorsCreated();
    vm.resetCallCounts();
    ZelTest_BeginLog();
    jbyteArray dst = vm.newByteArray(Bytes(100));
    jbyteArray src = vm.newByteArray(Bytes(100));
    EXPECT_EQ(encode(dst, 100, src, 100), 0);
    EXPECT_EQ(decode(dst, 100, src, 100), 0);
    EXPECT_EQ(errorId(), 14);
    EXPECT_EQ(vm.callCount("GetByteArrayElements"), 0);
    EXPECT_EQ(vm.callCount("SetByteArrayRegion"), 0);
    EXPECT_EQ(log(), "");
    EXPECT_EQ(ZelTest_CompressorsCreated(), before);
    EXPECT_EQ(vm.byteArrayValue(dst), Bytes(100));
}

TEST_F(VelzipCodec, BadArraysAndSizesAreRefusedLikeASizeFailure) {
    const int before = ZelTest_CompressorsCreated();
    vm.resetCallCounts();
    ZelTest_BeginLog();
    jbyteArray big = vm.newByteArray(Bytes(5000));
    jbyteArray small = vm.newByteArray(Bytes(10));
    for (const char* name : {kEncode, kDecode}) {
        auto call = [&](jbyteArray d, jint ds, jbyteArray s, jint ss) {
            return lib.call<jint>(name, jclass{}, d, ds, s, ss);
        };
        EXPECT_EQ(call(nullptr, 1000, small, 10), 0);
        EXPECT_EQ(call(big, 1000, nullptr, 0), 0);
        EXPECT_EQ(call(big, -1, small, 10), 0);
        EXPECT_EQ(call(big, 1000, small, -1), 0);
        EXPECT_EQ(call(big, 1000, small, INT_MIN), 0);
        EXPECT_EQ(call(big, 1000, small, 11), 0) << "srcSize beyond src";
        EXPECT_EQ(call(small, 1000, small, 10), 0) << "dstSize beyond dst";
        EXPECT_EQ(call(big, INT_MAX, big, 5000), 0);
        EXPECT_EQ(errorId(), 14);
    }
    EXPECT_EQ(vm.callCount("GetByteArrayElements"), 0);
    EXPECT_EQ(log(), "");
    EXPECT_EQ(ZelTest_CompressorsCreated(), before);
}

// The plain 32-bit formulas, where they are defined (the truncated value fits 32 bits).
TEST(VelzipSizeBounds, SameAsThe32BitFormulaWhereverItIsDefined) {
    auto plainEncode = [](int32_t dst, int32_t src, bool* defined) {
        const double v = src * 1.01 + 36.0;
        *defined = v < 2147483648.0;
        return *defined && dst >= static_cast<int32_t>(v);
    };
    auto plainDecode = [](int32_t dst, int32_t src) {
        const double v = static_cast<double>(dst - 36) / 1.01;
        return static_cast<int32_t>(v) >= src;
    };
    std::vector<int32_t> sizes;
    for (int32_t s = 0; s < 5000; ++s) {
        sizes.push_back(s);
    }
    for (int64_t s = 5000; s < INT32_MAX; s = s * 21 / 20 + 7) {
        sizes.push_back(static_cast<int32_t>(s));
    }
    for (int32_t s :
         {2126230318, 2126230319, 2126230320, INT32_MAX - 40, INT32_MAX - 36, INT32_MAX - 1, INT32_MAX}) {
        sizes.push_back(s);
    }
    int compared = 0;
    for (int32_t src : sizes) {
        bool defined = false;
        const double bound = src * 1.01 + 36.0;
        for (int64_t dst64 :
             {int64_t(bound) - 1, int64_t(bound), int64_t(bound) + 1, int64_t(src), int64_t(INT32_MAX)}) {
            if (dst64 < 0 || dst64 > INT32_MAX) {
                continue;
            }
            const int32_t dst = static_cast<int32_t>(dst64);
            const bool plain = plainEncode(dst, src, &defined);
            if (defined) {
                ASSERT_EQ(velzip::encodeSizesFit(dst, src), plain) << dst << " for " << src;
                ++compared;
            } else {
                ASSERT_FALSE(velzip::encodeSizesFit(dst, src)) << "a bound beyond 2^31 refuses " << dst;
            }
            ASSERT_EQ(velzip::decodeSizesFit(dst, src), plainDecode(dst, src)) << dst << " for " << src;
        }
    }
    EXPECT_GT(compared, 15000);
    // The documented edges.
    EXPECT_TRUE(velzip::encodeSizesFit(137, 100));
    EXPECT_FALSE(velzip::encodeSizesFit(136, 100));
    EXPECT_TRUE(velzip::decodeSizesFit(137, 100));
    EXPECT_FALSE(velzip::decodeSizesFit(136, 100));
    EXPECT_TRUE(velzip::decodeSizesFit(35, 0));
    EXPECT_FALSE(velzip::decodeSizesFit(34, 0));
    EXPECT_FALSE(velzip::encodeSizesFit(INT32_MAX, INT32_MAX));
    EXPECT_FALSE(velzip::encodeSizesFit(-1, 0));
    EXPECT_FALSE(velzip::decodeSizesFit(0, -1));
}

TEST_F(VelzipCodec, CompressorIsMadeOnceLazilyWithVersion38AndFlags10) {
    const int before = ZelTest_CompressorsCreated();
    ZelTest_BeginLog();
    EXPECT_EQ(intCall(kHeaderBytes), 16);
    EXPECT_EQ(log(), "new SetVersion(3,8) SetCompressFlags(1,0) GetNumHeaderBytes");
    ZelTest_BeginLog();
    EXPECT_EQ(intCall(kHeaderBytes), 16);
    packed(bytes("again"));
    EXPECT_EQ(log(), "GetNumHeaderBytes Compress");
    EXPECT_EQ(ZelTest_CompressorsCreated(), before + 1);
}

// Each method in a freshly loaded library: which ones create the compressor.
TEST(VelzipCompressor, EveryMethodOfPart24ButIsVelmorEncryptedCreatesIt) {
    testfs::TempFolder dir;
    {
        jnihost::Vm vm;
        jnihost::Library lib(vm);
        const std::string path = dir.file("f.vz");
        lib.call<jboolean>(kOpen, jclass{}, vm.newStringUtf8(path), jboolean{1});
        lib.call<jint>(kWriteData, jclass{}, vm.newByteArray(Bytes(10, 'a')), jint{10});
        lib.call<jboolean>(kClose, jclass{});
    }
    const std::string path = dir.file("f.vz");
    const Bytes header = testfs::readAll(dir.wfile("f.vz"));
    struct Case {
        const char* name;
        bool opens;
        bool creates;
    };
    const Case cases[] = {{kEncode, false, true},
                          {kDecode, false, true},
                          {kIsZip, true, true},
                          {kIsEncrypted, true, false},
                          {kCompressedOfFile, true, true},
                          {kCompressedOfHeader, false, true},
                          {kUncompressedOfFile, true, true},
                          {kUncompressedOfHeader, false, true},
                          {kHeaderBytes, false, true},
                          {kSizeofCompressed, false, true},
                          {kSizeofUnCompressed, false, true},
                          {kIsZip, false, false}};
    for (const Case& c : cases) {
        jnihost::Vm vm;
        vm.setViolationHandler([](const std::string& what) { ADD_FAILURE() << "JNI host: " << what; });
        jnihost::Library lib(vm);
        if (c.opens) {
            ASSERT_TRUE(lib.call<jboolean>(kOpen, jclass{}, vm.newStringUtf8(path), jboolean{0}));
        }
        const int before = ZelTest_CompressorsCreated();
        ZelTest_BeginLog();
        const std::string name = c.name;
        if (name == kEncode || name == kDecode) {
            lib.call<jint>(c.name, jclass{}, vm.newByteArray(Bytes(100)), jint{100},
                           vm.newByteArray(Bytes(10)), jint{10});
        } else if (name == kCompressedOfHeader || name == kUncompressedOfHeader ||
                   name == kSizeofUnCompressed) {
            lib.call<jint>(c.name, jclass{}, vm.newByteArray(header));
        } else if (name == kSizeofCompressed) {
            lib.call<jint>(c.name, jclass{}, jint{10}, jboolean{1}, jboolean{1}, jboolean{1});
        } else {
            lib.call<jint>(c.name, jclass{});
        }
        const std::string log = ZelTest_Log();
        ZelTest_EndLog();
        EXPECT_EQ(ZelTest_CompressorsCreated(), before + (c.creates ? 1 : 0))
            << c.name << (c.opens ? " open" : "");
        if (c.creates) {
            EXPECT_EQ(log.rfind("new SetVersion(3,8) SetCompressFlags(1,0) ", 0), 0u)
                << c.name << ": " << log;
        }
        lib.call<jboolean>(kClose, jclass{});
    }
}

TEST_F(VelzipCodec, EncryptedIsFalseOnlyForVersionText00) {
    makeFile("v.vz", bytes("data\n"));
    const Bytes good = testfs::readAll(dir.wfile("v.vz"));
    ASSERT_GE(good.size(), 16u);
    struct Case {
        const char* text;
        bool encrypted;
    };
    for (Case c : {Case{"00", false}, Case{"", true}, Case{"0", true}, Case{"000", true}, Case{"01", true}}) {
        Bytes file = good;
        std::memset(file.data() + 4, 0, 4);
        std::memcpy(file.data() + 4, c.text, std::strlen(c.text));
        ASSERT_TRUE(testfs::writeAll(dir.wfile("enc.vz"), file));
        ASSERT_TRUE(open(dir.file("enc.vz"), 0)) << c.text;
        const int before = ZelTest_CompressorsCreated();
        ZelTest_BeginLog();
        EXPECT_EQ(boolCall(kIsEncrypted), c.encrypted) << '"' << c.text << '"';
        EXPECT_EQ(log(), "get_zf_version");
        EXPECT_EQ(ZelTest_CompressorsCreated(), before);
        EXPECT_EQ(errorId(), 0);
        ASSERT_TRUE(close());
    }
}

TEST_F(VelzipCodec, EncryptedOnAFileOpenForWritingGives9) {
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    ZelTest_BeginLog();
    EXPECT_FALSE(boolCall(kIsEncrypted));
    EXPECT_EQ(errorId(), 9);
    EXPECT_EQ(log(), "");
}

TEST_F(VelzipCodec, QueriesAboutTheOpenFile) {
    const Bytes data = sampleData(30000, true);
    const std::string path = makeFile("q.vz", data);
    const size_t fileSize = testfs::readAll(dir.wfile("q.vz")).size();
    ASSERT_TRUE(open(path, 0));
    ZelTest_BeginLog();
    EXPECT_TRUE(boolCall(kIsZip));
    EXPECT_EQ(intCall(kCompressedOfFile), static_cast<int>(fileSize - 16));
    EXPECT_EQ(intCall(kUncompressedOfFile), 30000);
    EXPECT_EQ(log(),
              "new SetVersion(3,8) SetCompressFlags(1,0) FileDesc(0) IsVelmorZipFormat(1) "
              "FileDesc(0) GetNumCompressedBytes(fd) FileDesc(0) GetNumUnCompressedBytes(fd)");
    EXPECT_EQ(errorId(), 0);
}

TEST_F(VelzipCodec, IsVelmorZipAsksAboutAFileOpenForWriting) {
    ASSERT_TRUE(open(dir.file("w.vz"), 1));
    ASSERT_EQ(writeData(bytes("hello")), 1);
    ZelTest_BeginLog();
    EXPECT_TRUE(boolCall(kIsZip));
    EXPECT_NE(log().find("IsVelmorZipFormat(1)"), std::string::npos);
    EXPECT_EQ(intCall(kUncompressedOfFile), 5);
}

TEST_F(VelzipCodec, DeepFormatCheckFailsOnATruncatedFile) {
    makeFile("good.vz", sampleData(20000, false));
    Bytes file = testfs::readAll(dir.wfile("good.vz"));
    file.pop_back();
    ASSERT_TRUE(testfs::writeAll(dir.wfile("cut.vz"), file));
    ASSERT_TRUE(open(dir.file("cut.vz"), 0));
    EXPECT_FALSE(boolCall(kIsZip));
    EXPECT_EQ(errorId(), 0) << "a plain answer, no failure";
}

TEST_F(VelzipCodec, HeaderArrayQueriesWorkWithNoFileAndRecordNothing) {
    const Bytes pack = packed(sampleData(5000, true));
    jbyteArray header = vm.newByteArray(pack);
    EXPECT_EQ(headerCall(kCompressedOfHeader, header), static_cast<int>(pack.size() - 16));
    EXPECT_EQ(headerCall(kUncompressedOfHeader, header), 5000);
    EXPECT_EQ(headerCall(kSizeofUnCompressed, header), 5001) << "flags 1, 1, 0: validated, room for a zero";
    EXPECT_EQ(intCall(kHeaderBytes), 16);
    // Just the 16 header bytes are enough.
    jbyteArray exact = vm.newByteArray(Bytes(pack.begin(), pack.begin() + 16));
    EXPECT_EQ(headerCall(kUncompressedOfHeader, exact), 5000);
    EXPECT_EQ(errorId(), 0);
    EXPECT_EQ(errorMsg(), std::nullopt);
}

TEST_F(VelzipCodec, NullOrShortHeaderArrayGivesZeroUnread) {
    const Bytes pack = packed(sampleData(5000, true));
    for (const char* name : {kCompressedOfHeader, kUncompressedOfHeader, kSizeofUnCompressed}) {
        vm.resetCallCounts();
        EXPECT_EQ(headerCall(name, jbyteArray{}), 0) << name;
        EXPECT_EQ(headerCall(name, vm.newByteArray(Bytes{})), 0) << name;
        EXPECT_EQ(headerCall(name, vm.newByteArray(Bytes(pack.begin(), pack.begin() + 15))), 0) << name;
        EXPECT_EQ(vm.callCount("GetByteArrayElements"), 0) << name;
    }
    EXPECT_EQ(errorId(), 0);
}

TEST_F(VelzipCodec, BufferSizeFlagsAreOneOnlyForExactlyOne) {
    ZelTest_BeginLog();
    EXPECT_EQ(
        lib.call<jint>(kSizeofCompressed, jclass{}, jint{1000}, jboolean{1}, jboolean{2}, jboolean{0xFF}),
        1016);
    EXPECT_EQ(log(), "new SetVersion(3,8) SetCompressFlags(1,0) GetSizeofCompressedBuffer(1000,1,0,0)");
    EXPECT_EQ(lib.call<jint>(kSizeofCompressed, jclass{}, jint{1000}, jboolean{0}, jboolean{1}, jboolean{1}),
              1024);
    EXPECT_EQ(lib.call<jint>(kSizeofCompressed, jclass{}, jint{1000}, jboolean{1}, jboolean{1}, jboolean{1}),
              1040);
}

TEST_F(VelzipCodec, UnsignedResultsKeepTheirBits) {
    // 0xFFFFFFFF as size, saturated by the library, comes back as -1.
    EXPECT_EQ(lib.call<jint>(kSizeofCompressed, jclass{}, jint{-1}, jboolean{1}, jboolean{1}, jboolean{1}),
              -1);
    Bytes header = packed(bytes("x"));
    header[12] = header[13] = header[14] = header[15] = 0xFF;
    EXPECT_EQ(headerCall(kUncompressedOfHeader, vm.newByteArray(header)), -1);
}

}  // namespace
