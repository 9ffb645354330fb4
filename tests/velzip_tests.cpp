// VelzipFile through the JNI host and the real exports, with the stand-in libZelbrin.dll
// underneath. The test links libZelbrin.dll too, so it reads that library's log of interface
// calls and its counts of streams and compressors (ZelTest_*).
#include <windows.h>

#include <algorithm>
#include <climits>
#include <cstring>
#include <functional>
#include <optional>
#include <string>
#include <tuple>
#include <vector>

#include "sample_data.h"
#include "velzip/size_bounds.h"
#include "velzip_fixture.h"

namespace {

using namespace testkit::vz;
using Bytes = std::vector<uint8_t>;
using testkit::sampleData;
using Velzip = testkit::VelzipTest;

Bytes bytes(const std::string& s) {
    return Bytes(s.begin(), s.end());
}

const char kNoOutput[] = "Output stream has not been initialized.";
const char kNoInput[] = "Input stream has not been initialized.";
const char kBadSizes[] = "Incorrect buffer sizes specified.";

// ======================= File state =======================

using VelzipFileState = Velzip;

TEST(VelzipLoad, FileInitLivesWhileLoadedAndItsTearDownCompletesAFileLeftOpen) {
    testkit::TempFolder dir;
    const std::string path = dir.file("left.vz");
    ASSERT_EQ(ZelTest_LiveFileInits(), 0);
    {
        jnihost::Vm vm;
        jnihost::Library lib(vm);
        testkit::VelzipClient vz(vm, lib);
        EXPECT_EQ(ZelTest_LiveFileInits(), 1);
        ASSERT_TRUE(vz.open(path, 1));
        ASSERT_TRUE(vz.printLine("tail\n"));
    }
    EXPECT_EQ(ZelTest_LiveFileInits(), 0);
    EXPECT_EQ(ZelTest_LiveStreams(), 0);
    jnihost::Vm vm;
    jnihost::Library lib(vm);
    testkit::VelzipClient vz(vm, lib);
    ASSERT_TRUE(vz.open(path, 0));
    EXPECT_EQ(vz.readLine(), "tail\n") << "unloading completed the file";
}

TEST_F(VelzipFileState, EachOpenFailureHasItsIdMessageAndCallOrderAndEndsWithNoFile) {
    EXPECT_EQ(vz.errorId(), 0) << "nothing recorded at load";
    EXPECT_EQ(vz.errorMsg(), std::nullopt);
    mark();
    lib.call<void>(kInitialize, jclass{});
    EXPECT_EQ(log(), "") << "initialize does nothing";

    const std::string held = dir.file("held.vz"), busy = dir.file("busy.vz"), plain = dir.file("plain.txt");
    const std::string noFolder = dir.file("no-folder\\new.vz");
    // A long name outside the ANSI code page: formatted whole and back through modified UTF-8.
    const std::string missing = dir.file(std::string(3000, 'n') + "-\u65e5\U0001F600.vz");
    ASSERT_TRUE(vz.writeFile(held, bytes("x\n")) && vz.writeFile(busy, bytes("x\n")));
    ASSERT_TRUE(testkit::writeAll(dir.wfile("plain.txt"), bytes("just text\n")));
    // Held without sharing: not readable. Held for writing: writable, but a second writer is refused.
    HANDLE hold[] = {
        CreateFileW(dir.wfile("held.vz").c_str(), GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr),
        CreateFileW(dir.wfile("busy.vz").c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                    OPEN_EXISTING, 0, nullptr)};
    ASSERT_TRUE(hold[0] != INVALID_HANDLE_VALUE && hold[1] != INVALID_HANDLE_VALUE);
    struct Case {
        std::optional<std::string> path;
        jboolean forWrite;
        int id;
        std::string message, calls;
    };
    const Case cases[] = {
        {std::nullopt, 0, 1, "NULL file path detected.\n", ""},
        {"", 1, 2, "File path is the empty string.\n", ""},
        {missing, 0, 5, "File " + missing + " does not exist.", "exist velform"},
        {held, 0, 4, "File " + held + " does not have read permissions.", "exist canread velform"},
        {plain, 0, 3, "Failure to open file " + plain + " for read.", "exist canread open(1,1) velform"},
        {noFolder, 1, 7, "Cannot write to file " + noFolder + ".", "canwrite velform"},
        {busy, 1, 6, "Failure to open file " + busy + " for write.", "canwrite open(170,1) velform"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE("id " + std::to_string(c.id));
        ASSERT_TRUE(vz.open(dir.file("w.vz"), 1));
        mark();
        EXPECT_FALSE(c.path ? vz.open(*c.path, c.forWrite) : vz.open(jstring{}, c.forWrite));
        EXPECT_EQ(log(), c.calls.empty() ? "close" : "close " + c.calls) << "the reset closes w.vz first";
        EXPECT_EQ(vz.errorId(), c.id);
        EXPECT_EQ(vz.errorMsg(), c.message);
        if (!c.path) {
            EXPECT_EQ(vm.callCount("GetStringUTFChars"), 0);
        }
        EXPECT_EQ(ZelTest_LiveStreams(), 0);
        EXPECT_FALSE(vz.printLine("x")) << "no file is open";
    }
    CloseHandle(hold[0]);
    CloseHandle(hold[1]);
}

TEST_F(VelzipFileState, OpenClosesAnOpenFileClearsTheRecordWhichThenStaysUntilTheNextOpen) {
    // A name outside the ANSI code page crosses as modified UTF-8 and is the file's name on disk.
    const std::string path = dir.file("\u65e5\u672c-\u00e9-\U0001F600.vz");
    forget();
    mark();
    ASSERT_TRUE(vz.open(path, 1));
    EXPECT_EQ(log(), "canwrite open(170,1) getfid");
    EXPECT_EQ(vz.errorId(), 0);
    EXPECT_EQ(vz.errorMsg(), std::nullopt);
    EXPECT_TRUE(testkit::exists(dir.wpath() + L"\\\u65e5\u672c-\u00e9-\U0001F600.vz"));
    EXPECT_TRUE(vz.printLine("\u00e9t\u00e9\n"));
    mark();
    ASSERT_TRUE(vz.open(dir.file("second.vz"), 1));
    EXPECT_EQ(log(), "close canwrite open(170,1) getfid") << "the earlier file is closed, not leaked";
    for (jboolean forWrite : {jboolean{0}, jboolean{2}, jboolean{0xFF}}) {
        SCOPED_TRACE(int(forWrite));
        mark();
        ASSERT_TRUE(vz.open(path, forWrite));
        EXPECT_EQ(log(), "close exist canread open(1,1) getfid") << "anything but 1 reads";
        EXPECT_EQ(ZelTest_LiveStreams(), 1);
        EXPECT_EQ(vz.errorId(), 0);
        EXPECT_FALSE(vz.printLine("x"));
        EXPECT_EQ(vz.readLine(), "\u00e9t\u00e9\n") << "the unflushed line reached the file";
        EXPECT_TRUE(vz.boolCall(kIsZip));
        EXPECT_EQ(vz.readLine(), std::nullopt);
        EXPECT_EQ(vz.errorId(), 8) << "successes keep the record";
        EXPECT_EQ(vz.errorMsg(), kNoOutput);
    }
}

TEST_F(VelzipFileState, WithoutAFileCloseCallsNothingAndTheOperationsReport8Or9) {
    // Each operation with its result and id.
    const std::tuple<std::function<int()>, int, int> ops[] = {
        {[&] { return int(vz.printLine("x")); }, 0, 8},
        {[&] { return vz.writeData(bytes("abc")); }, -1, 8},
        {[&] { return vz.readData(vm.newByteArray(Bytes(4)), 4); }, -1, 9},
        {[&] { return int(vz.readLine().has_value()); }, 0, 9},
        {[&] { return int(vz.boolCall(kIsZip)); }, 0, 9},
        {[&] { return int(vz.boolCall(kIsEncrypted)); }, 0, 9},
        {[&] { return vz.intCall(kCompressedOfFile); }, 0, 9},
        {[&] { return vz.intCall(kUncompressedOfFile); }, 0, 9},
    };
    for (bool afterClose : {false, true}) {
        if (afterClose) {
            ASSERT_TRUE(vz.open(dir.file("w.vz"), 1));
            mark();
            EXPECT_TRUE(vz.close());
            EXPECT_EQ(log(), "close");
        }
        mark();
        EXPECT_TRUE(vz.close()) << "with nothing open";
        for (size_t i = 0; i < std::size(ops); ++i) {
            const auto& [call, result, id] = ops[i];
            forget();
            EXPECT_EQ(call(), result) << "operation " << i;
            EXPECT_EQ(vz.errorId(), id) << "operation " << i;
            EXPECT_EQ(vz.errorMsg(), id == 8 ? kNoOutput : kNoInput) << "operation " << i;
        }
        EXPECT_TRUE(vz.close());
        EXPECT_EQ(vz.errorId(), 9) << "closing keeps the record";
        EXPECT_EQ(log(), "") << "nothing reaches the library";
    }
}

// ======================= Stream I/O =======================

using VelzipStreamIo = Velzip;

TEST_F(VelzipStreamIo, LinesRoundTripOnePerReadAsTheirExactBytes) {
    const std::string full = std::string(2046, 'w') + "\n";  // 2047 bytes: the longest line read whole
    const std::string longer = std::string(3000, 'z') + "\n";
    const std::string text = "caf\u00e9 \u65e5\u672c \U0001F600\n";
    ASSERT_TRUE(vz.open(dir.file("lines.vz"), 1));
    mark();
    EXPECT_TRUE(vz.printLine("abc"));
    EXPECT_EQ(log(), "write geterror") << "one write, then its error";
    EXPECT_TRUE(vz.printLine(""));
    EXPECT_EQ(vz.intCall(kUncompressedOfFile), 3) << "no line feed added; the empty string writes nothing";
    for (const std::string& line : {std::string("\n"), std::string("\n"), full, text, longer}) {
        EXPECT_TRUE(vz.printLine(line));
    }
    EXPECT_TRUE(vz.printLine(vm.newString(std::u16string(u"ab\0cd\n", 6))));  // Java's NUL crosses as C0 80
    ASSERT_EQ(vz.writeData(Bytes{'x', 'y', 0, 'z', '\n'}), 1);                // a raw zero byte ends a string
    EXPECT_TRUE(vz.printLine("last, without line feed"));
    ASSERT_TRUE(vz.close());

    ASSERT_TRUE(vz.open(dir.file("lines.vz"), 0));
    for (const std::string& line :
         {std::string("abc\n"), std::string("\n"), full, text, longer.substr(0, 2047), longer.substr(2047),
          std::string("ab\0cd\n", 6), std::string("xy"), std::string("last, without line feed")}) {
        EXPECT_EQ(vz.readLine(), line);
    }
    EXPECT_EQ(vz.readLine(), std::nullopt);
    EXPECT_EQ(vz.readLine(), std::nullopt);
    EXPECT_EQ(vz.errorId(), 0) << "the end of the data is no failure";
}

TEST_F(VelzipStreamIo, BlocksRoundTripOneLibraryCallEach) {
    const Bytes data = sampleData(1 << 20, false);
    ASSERT_TRUE(vz.open(dir.file("blocks.vz"), 1));
    mark();
    EXPECT_EQ(vz.writeData(bytes("12345\n")), 1);
    EXPECT_EQ(log(), "write geterror");
    size_t at = 0;
    for (size_t size : {size_t{0}, size_t{1}, size_t{65536}, size_t{100000}, size_t{65536}}) {
        EXPECT_EQ(vz.writeData(Bytes(data.begin() + at, data.begin() + at + size)), 1);
        at += size;
    }
    EXPECT_EQ(vz.writeData(Bytes(data.begin() + at, data.begin() + at + 5000), 1000), 1)
        << "only length bytes";
    at += 1000;
    ASSERT_TRUE(vz.close());

    ASSERT_TRUE(vz.open(dir.file("blocks.vz"), 0));
    mark();
    jbyteArray buffer = vm.newByteArray(Bytes(10, 0x55));
    EXPECT_EQ(vz.readData(buffer, 10), 6) << "the read stops after the line feed";
    EXPECT_EQ(log(), "read geterror");
    EXPECT_EQ(vm.byteArrayValue(buffer), (Bytes{'1', '2', '3', '4', '5', '\n', 0x55, 0x55, 0x55, 0x55}));
    int last = 1;
    EXPECT_EQ(vz.readAllData(65536, &last), Bytes(data.begin(), data.begin() + at));
    EXPECT_EQ(last, 0);
    EXPECT_EQ(vz.errorId(), 0) << "the end gives 0 with nothing recorded";
}

TEST_F(VelzipStreamIo, FailedWritesRecord12ForLinesAndNothingForBlocks) {
    ASSERT_TRUE(vz.open(dir.file("w.vz"), 1));
    ZelTest_FailWrites(Zel::ErrWrite);
    EXPECT_EQ(vz.writeData(bytes("abc")), 0);
    EXPECT_EQ(vz.errorId(), 0);
    EXPECT_FALSE(vz.printLine("later\n"));
    EXPECT_EQ(vz.errorId(), 12);
    EXPECT_EQ(vz.errorMsg(), "Error writing encoded output file: 2");
    EXPECT_EQ(vz.writeData(bytes("abc")), 0);
    EXPECT_EQ(vz.errorId(), 12) << "still the earlier record";
}

TEST_F(VelzipStreamIo, DamagedFilesFailReadsWith13) {
    // A failed read (the library's -1) copies nothing into the array.
    ASSERT_TRUE(vz.open(
        alteredFile("bad.vz", sampleData(1000, false), [](Bytes& f) { f[f.size() / 2] ^= 0xFF; }), 0));
    jbyteArray buffer = vm.newByteArray(Bytes(4096, 0x55));
    vm.resetCallCounts();
    EXPECT_EQ(vz.readData(buffer, 4096), 0);
    EXPECT_EQ(vz.errorId(), 13);
    EXPECT_EQ(vm.byteArrayValue(buffer), Bytes(4096, 0x55));
    EXPECT_EQ(vm.callCount("SetByteArrayRegion"), 0);

    // readLineN stops at a count of 0 or less before asking geterror, so a truncated body
    // looks like the end to it; readDataN then tells.
    const Bytes text = bytes("one\ntwo\n" + std::string(50000, 'q'));
    ASSERT_TRUE(vz.open(alteredFile("cut.vz", text, [](Bytes& f) { f.resize(f.size() - 4); }), 0));
    for (int i = 0; vz.readLine() && i < 100; ++i) {
    }
    EXPECT_EQ(vz.errorId(), 0);
    EXPECT_EQ(vz.readData(vm.newByteArray(Bytes(8)), 8), 0);
    EXPECT_EQ(vz.errorId(), 13);
    EXPECT_EQ(vz.errorMsg(), "Error: 5 reading encoded input file.");
}

// An error that the library reports after delivering bytes, as a disk error can: neither
// read hands on what it got, both record 13 with the number, and the block read leaves the
// copied bytes in the array.
TEST_F(VelzipStreamIo, AnErrorAfterDeliveredBytesFailsBothReadsWith13) {
    ASSERT_TRUE(vz.writeFile(dir.file("r.vz"), bytes("first line\nsecond\n")));
    ASSERT_TRUE(vz.open(dir.file("r.vz"), 0));
    ZelTest_FailReads(Zel::ErrRead);
    EXPECT_EQ(vz.readLine(), std::nullopt);
    EXPECT_EQ(vz.errorId(), 13);
    EXPECT_EQ(vz.errorMsg(), "Error: 1 reading encoded input file.");

    ASSERT_TRUE(vz.open(dir.file("r.vz"), 0));  // from the start, with the record cleared
    ZelTest_FailReads(Zel::ErrCorrupt);
    jbyteArray buffer = vm.newByteArray(Bytes(14, 0x55));
    EXPECT_EQ(vz.readData(buffer, 14), 0);
    EXPECT_EQ(vz.errorId(), 13);
    EXPECT_EQ(vz.errorMsg(), "Error: 4 reading encoded input file.");
    Bytes expected = bytes("first line\n");
    expected.resize(14, 0x55);
    EXPECT_EQ(vm.byteArrayValue(buffer), expected);
}

TEST_F(VelzipStreamIo, BadArgumentsAreRefusedAfterTheStreamCheckBeforeAnyAccess) {
    EXPECT_EQ(vz.writeData(jbyteArray{}, -1), -1) << "no stream comes first";
    EXPECT_EQ(vz.errorId(), 8);
    EXPECT_EQ(vz.readData(jbyteArray{}, -1), -1);
    EXPECT_EQ(vz.errorId(), 9);

    ASSERT_TRUE(vz.open(dir.file("w.vz"), 1));
    mark();
    EXPECT_FALSE(vz.printLine(jstring{}));
    EXPECT_EQ(vm.callCount("GetStringUTFChars"), 0);
    EXPECT_EQ(vz.errorId(), 0) << "printLineN(null) records nothing";
    jbyteArray written = vm.newByteArray(bytes("abc")), read = vm.newByteArray(Bytes(3, 0x55));
    for (bool reading : {false, true}) {
        SCOPED_TRACE(reading ? "readDataN" : "writeDataN");
        auto call = [&](jbyteArray a, jint n) { return reading ? vz.readData(a, n) : vz.writeData(a, n); };
        EXPECT_EQ(call(vm.newByteArray(Bytes{}), 0), reading ? 0 : 1) << "a zero length is fine";
        EXPECT_EQ(vz.errorId(), 0);
        mark();
        EXPECT_EQ(call(jbyteArray{}, 3), 0);
        EXPECT_EQ(vz.errorId(), 14);
        EXPECT_EQ(vz.errorMsg(), kBadSizes);
        for (jint length : {-1, 4, INT_MAX, INT_MIN}) {
            EXPECT_EQ(call(reading ? read : written, length), 0) << length;
        }
        EXPECT_EQ(log(), "") << "nothing written or read";
        EXPECT_EQ(vm.callCount("GetByteArrayElements") + vm.callCount("SetByteArrayRegion"), 0);
        EXPECT_EQ(call(reading ? read : written, 3), reading ? 3 : 1);
        if (!reading) {
            ASSERT_TRUE(vz.open(dir.file("w.vz"), 0));
        }
    }
    EXPECT_EQ(vm.byteArrayValue(read), bytes("abc"));
    EXPECT_EQ(vz.readData(read, 3), 0) << "and nothing else was written";
}

// ======================= Memory codec and header queries =======================

using VelzipCodec = Velzip;

TEST_F(VelzipCodec, BuffersRoundTrip) {
    for (size_t size : {size_t{0}, size_t{1}, size_t{100}, size_t{70000}, size_t{2 << 20}}) {
        for (bool text : {true, false}) {
            SCOPED_TRACE(std::to_string(size) + (text ? " text" : " random"));
            const Bytes data = sampleData(size, text);
            const Bytes pack = vz.pack(data);
            ASSERT_GT(pack.size(), 16u);
            // decodeMemN wants dstSize >= srcSize * 1.01 + 36 as well.
            const size_t dstSize = std::max<size_t>(size, pack.size() * 1.01 + 37);
            jbyteArray dst = vm.newByteArray(Bytes(dstSize));
            EXPECT_EQ(vz.decode(dst, jint(dstSize), vm.newByteArray(pack), jint(pack.size())), int(size));
            Bytes back = vm.byteArrayValue(dst);
            back.resize(size);
            EXPECT_EQ(back, data);
        }
    }
    EXPECT_EQ(vz.errorId(), 0);
}

// Java may pass one array as both source and destination; the host copies elements as a
// JVM does, so releasing the source with a copy back would put the input over the output.
TEST_F(VelzipCodec, OneArrayAsSourceAndDestinationKeepsTheOutput) {
    const Bytes data = sampleData(100, true);
    Bytes buffer = data;
    buffer.resize(200);
    jbyteArray same = vm.newByteArray(buffer);
    const Bytes pack = vz.pack(data);
    ASSERT_EQ(vz.encode(same, 200, same, 100), int(pack.size()));
    Bytes packed = vm.byteArrayValue(same);
    packed.resize(pack.size());
    EXPECT_EQ(packed, pack);

    ASSERT_EQ(vz.decode(same, 200, same, jint(pack.size())), 100);
    Bytes back = vm.byteArrayValue(same);
    back.resize(100);
    EXPECT_EQ(back, data);
}

// Arrays the library only reads are released without a copy back: it would cost a full copy,
// and could overwrite what another thread wrote into the array meanwhile.
TEST_F(VelzipCodec, ArraysOnlyReadAreNeverCopiedBack) {
    const Bytes data = sampleData(3000, true);
    jbyteArray header = vm.newByteArray(vz.pack(data));
    ASSERT_TRUE(vz.open(dir.file("w.vz"), 1));
    mark();
    EXPECT_EQ(vz.writeData(data), 1);
    EXPECT_GT(vz.encode(vm.newByteArray(Bytes(4000)), 4000, vm.newByteArray(data), 3000), 0);
    EXPECT_EQ(vz.decode(vm.newByteArray(Bytes(4000)), 4000, header, 100), 0) << "header only: no data";
    for (const char* query : {kCompressedOfHeader, kUncompressedOfHeader, kSizeofUnCompressed}) {
        EXPECT_GT(vz.headerCall(query, header), 0) << query;
    }
    EXPECT_EQ(vm.callCount("ReleaseByteArrayElements"), 6);
    EXPECT_EQ(vm.copyBackCount(), 0);
}

TEST_F(VelzipCodec, SizeChecksAtTheirExactEdges) {
    struct Edge {
        const char* name;
        jint srcSize, accepted;
    };
    // decodeMemN's 137 for 100 is the one that x87 arithmetic gets wrong.
    for (Edge e :
         {Edge{kEncode, 100, 137}, Edge{kEncode, 0, 36}, Edge{kEncode, 1024, 1070}, Edge{kEncode, 1, 37},
          Edge{kDecode, 1024, 1071}, Edge{kDecode, 100, 137}, Edge{kDecode, 1, 38}, Edge{kDecode, 0, 35}}) {
        SCOPED_TRACE(std::string(e.name == kEncode ? "encode " : "decode ") + std::to_string(e.srcSize));
        jbyteArray dst = vm.newByteArray(Bytes(2000));
        jbyteArray src = vm.newByteArray(sampleData(1024, true));
        ASSERT_TRUE(vz.open(dir.file("reset.vz"), 1));  // clears the record
        ASSERT_TRUE(vz.close());
        mark();
        const int n = lib.call<jint>(e.name, jclass{}, dst, e.accepted, src, e.srcSize);
        EXPECT_EQ(n > 0, e.name == kEncode) << "decoding plain text gives 0";
        EXPECT_NE(log().find(e.name == kEncode ? "Compress" : "UnCompress"), std::string::npos) << e.accepted;
        EXPECT_EQ(vz.errorId(), 0);
        mark();
        EXPECT_EQ(lib.call<jint>(e.name, jclass{}, dst, e.accepted - 1, src, e.srcSize), 0);
        EXPECT_EQ(vz.errorId(), 14) << "refuses " << e.accepted - 1;
        EXPECT_EQ(vz.errorMsg(), kBadSizes);
        EXPECT_EQ(log(), "");
    }
}

TEST_F(VelzipCodec, SizeFailuresAndBadArraysTakeNothingAndMakeNoCompressor) {
    const int before = ZelTest_CompressorsCreated();
    mark();
    jbyteArray big = vm.newByteArray(Bytes(5000));
    jbyteArray small = vm.newByteArray(Bytes(10));
    for (const char* name : {kEncode, kDecode}) {
        auto call = [&](jbyteArray d, jint ds, jbyteArray s, jint ss) {
            forget();
            const int n = lib.call<jint>(name, jclass{}, d, ds, s, ss);
            EXPECT_EQ(vz.errorId(), 14) << name << " " << ds << " for " << ss;
            return n;
        };
        EXPECT_EQ(call(big, 100, big, 100), 0) << "a plain size failure";
        EXPECT_EQ(call(nullptr, 1000, small, 10), 0);
        EXPECT_EQ(call(big, 1000, nullptr, 0), 0);
        EXPECT_EQ(call(big, -1, small, 10), 0);
        EXPECT_EQ(call(big, 1000, small, -1), 0);
        EXPECT_EQ(call(big, 1000, small, INT_MIN), 0);
        EXPECT_EQ(call(big, 1000, small, 11), 0) << "srcSize beyond src";
        EXPECT_EQ(call(small, 1000, small, 10), 0) << "dstSize beyond dst";
        EXPECT_EQ(call(big, INT_MAX, big, 5000), 0);
    }
    EXPECT_EQ(vm.callCount("GetByteArrayElements") + vm.callCount("SetByteArrayRegion"), 0);
    EXPECT_EQ(vm.byteArrayValue(big), Bytes(5000));
    EXPECT_EQ(log(), "");
    EXPECT_EQ(ZelTest_CompressorsCreated(), before);
}

// The bounds computed without overflow give the plain 32-bit formulas' answers wherever those
// are defined (the truncated value fits 32 bits), up to 2^31 - 1.
TEST(VelzipSizeBounds, SameAsThe32BitFormulaWhereverItIsDefined) {
    std::vector<int32_t> sizes;
    for (int64_t s = 0; s < INT32_MAX; s = s < 5000 ? s + 1 : s * 21 / 20 + 7) {
        sizes.push_back(static_cast<int32_t>(s));
    }
    sizes.insert(sizes.end(),
                 {2126230318, 2126230319, 2126230320, INT32_MAX - 40, INT32_MAX - 36, INT32_MAX});
    for (int32_t src : sizes) {
        const double bound = src * 1.01 + 36.0;
        for (int64_t dst64 :
             {int64_t(bound) - 1, int64_t(bound), int64_t(bound) + 1, int64_t(src), int64_t(INT32_MAX)}) {
            if (dst64 < 0 || dst64 > INT32_MAX) {
                continue;
            }
            const int32_t dst = static_cast<int32_t>(dst64);
            if (bound < 2147483648.0) {
                ASSERT_EQ(velzip::encodeSizesFit(dst, src), dst >= int32_t(bound)) << dst << " for " << src;
            } else {
                ASSERT_FALSE(velzip::encodeSizesFit(dst, src)) << "a bound beyond 2^31 refuses " << dst;
            }
            ASSERT_EQ(velzip::decodeSizesFit(dst, src), int32_t(double(dst - 36) / 1.01) >= src)
                << dst << " for " << src;
        }
    }
}

struct CompressorCase {
    const char* name;
    bool opens, creates;
};
// The method's name in the test's name and in its failures.
void PrintTo(const CompressorCase& c, std::ostream* os) {
    *os << std::strstr(c.name, "VelzipFile_") + 11 << (c.opens ? " with a file open" : "");
}
class VelzipCompressor : public Velzip, public ::testing::WithParamInterface<CompressorCase> {};

// Each method in a freshly loaded library: the first call creates the compressor (but not
// isVelmorEncryptedN's, nor a call that fails its file check), a second one reuses it.
TEST_P(VelzipCompressor, MadeOnceLazilyWithVersion38AndFlags10) {
    const auto [name, opens, creates] = GetParam();
    ASSERT_TRUE(vz.writeFile(dir.file("f.vz"), Bytes(10, 'a')));
    jbyteArray header = vm.newByteArray(testkit::readAll(dir.wfile("f.vz")));
    if (opens) {
        ASSERT_TRUE(vz.open(dir.file("f.vz"), 0));
    }
    const std::string n = name;
    auto call = [&] {
        if (n == kEncode || n == kDecode) {
            lib.call<jint>(name, jclass{}, vm.newByteArray(Bytes(100)), jint{100}, vm.newByteArray(Bytes(10)),
                           jint{10});
        } else if (n == kCompressedOfHeader || n == kUncompressedOfHeader || n == kSizeofUnCompressed) {
            vz.headerCall(name, header);
        } else if (n == kSizeofCompressed) {
            vz.sizeofCompressed(10, 1, 1, 1);
        } else {
            vz.intCall(name);
        }
    };
    const int before = ZelTest_CompressorsCreated();
    mark();
    call();
    const std::string first = log();
    call();
    EXPECT_EQ(ZelTest_CompressorsCreated(), before + (creates ? 1 : 0));
    EXPECT_EQ(first.rfind("new SetVersion(3,8) SetCompressFlags(1,0) ", 0), creates ? 0u : std::string::npos)
        << first;
    EXPECT_EQ(log().find("new ", 1), std::string::npos) << "the second call reuses it: " << log();
}

using C = CompressorCase;
INSTANTIATE_TEST_SUITE_P(EachMethod, VelzipCompressor,
                         ::testing::Values(C{kEncode, 0, 1}, C{kDecode, 0, 1}, C{kIsZip, 1, 1},
                                           C{kIsEncrypted, 1, 0}, C{kCompressedOfFile, 1, 1},
                                           C{kCompressedOfHeader, 0, 1}, C{kUncompressedOfFile, 1, 1},
                                           C{kUncompressedOfHeader, 0, 1}, C{kHeaderBytes, 0, 1},
                                           C{kSizeofCompressed, 0, 1}, C{kSizeofUnCompressed, 0, 1},
                                           C{kIsZip, 0, 0}));

TEST_F(VelzipCodec, QueriesAboutTheOpenFileOfEitherDirection) {
    ASSERT_TRUE(vz.writeFile(dir.file("q.vz"), sampleData(30000, true)));
    const Bytes good = testkit::readAll(dir.wfile("q.vz"));
    const std::pair<const char*, bool> versions[] = {
        {"01", true}, {"", true}, {"0", true}, {"000", true}, {"00", false}};
    for (auto [text, encrypted] : versions) {
        SCOPED_TRACE('"' + std::string(text) + '"');
        Bytes file = good;
        std::memset(file.data() + 4, 0, 4);  // the header's version text
        std::memcpy(file.data() + 4, text, std::strlen(text));
        const std::string name = "v" + std::string(text) + ".vz";  // the one before is still open
        ASSERT_TRUE(testkit::writeAll(dir.wfile(name), file));
        ASSERT_TRUE(vz.open(dir.file(name), 0));
        mark();
        EXPECT_EQ(vz.boolCall(kIsEncrypted), encrypted);
        EXPECT_EQ(log(), "get_zf_version") << "no compressor";
    }
    mark();
    EXPECT_TRUE(vz.boolCall(kIsZip));
    EXPECT_EQ(vz.intCall(kCompressedOfFile), int(good.size() - 16));
    EXPECT_EQ(vz.intCall(kUncompressedOfFile), 30000);
    EXPECT_EQ(log(),
              "new SetVersion(3,8) SetCompressFlags(1,0) FileDesc(0) IsVelmorZipFormat(1) "
              "FileDesc(0) GetNumCompressedBytes(fd) FileDesc(0) GetNumUnCompressedBytes(fd)");
    EXPECT_EQ(vz.errorId(), 0);

    ASSERT_TRUE(vz.open(alteredFile("cut.vz", sampleData(20000, false), [](Bytes& f) { f.pop_back(); }), 0));
    EXPECT_FALSE(vz.boolCall(kIsZip)) << "the deep check sees the truncated body";
    EXPECT_EQ(vz.errorId(), 0) << "a plain answer, no failure";

    ASSERT_TRUE(vz.open(dir.file("w.vz"), 1));
    ASSERT_EQ(vz.writeData(bytes("hello")), 1);
    mark();
    EXPECT_TRUE(vz.boolCall(kIsZip));
    EXPECT_EQ(vz.intCall(kUncompressedOfFile), 5);
    EXPECT_NE(log().find("IsVelmorZipFormat(1)"), std::string::npos);
    EXPECT_FALSE(vz.boolCall(kIsEncrypted)) << "no input stream";
    EXPECT_EQ(vz.errorId(), 9);
}

TEST_F(VelzipCodec, HeaderArrayQueriesNeedNoFileAndReadNothingPastTheArray) {
    const Bytes pack = vz.pack(sampleData(5000, true));
    jbyteArray header = vm.newByteArray(pack);
    EXPECT_EQ(vz.headerCall(kCompressedOfHeader, header), int(pack.size() - 16));
    EXPECT_EQ(vz.headerCall(kUncompressedOfHeader, header), 5000);
    EXPECT_EQ(vz.headerCall(kSizeofUnCompressed, header), 5001)
        << "flags 1, 1, 0: validated, room for a zero";
    EXPECT_EQ(vz.intCall(kHeaderBytes), 16);
    EXPECT_EQ(vz.headerCall(kUncompressedOfHeader, vm.newByteArray(Bytes(pack.begin(), pack.begin() + 16))),
              5000)
        << "the 16 header bytes are enough";
    for (const char* name : {kCompressedOfHeader, kUncompressedOfHeader, kSizeofUnCompressed}) {
        vm.resetCallCounts();
        EXPECT_EQ(vz.headerCall(name, jbyteArray{}), 0) << name;
        EXPECT_EQ(vz.headerCall(name, vm.newByteArray(Bytes{})), 0) << name;
        EXPECT_EQ(vz.headerCall(name, vm.newByteArray(Bytes(pack.begin(), pack.begin() + 15))), 0) << name;
        EXPECT_EQ(vm.callCount("GetByteArrayElements"), 0) << name;
    }
    Bytes huge = pack;
    huge[12] = huge[13] = huge[14] = huge[15] = 0xFF;
    EXPECT_EQ(vz.headerCall(kUncompressedOfHeader, vm.newByteArray(huge)), -1) << "unsigned bits kept";
    EXPECT_EQ(vz.errorId(), 0);
    EXPECT_EQ(vz.errorMsg(), std::nullopt);
}

TEST_F(VelzipCodec, BufferSizeFlagsAreOneOnlyForExactlyOne) {
    mark();
    EXPECT_EQ(vz.sizeofCompressed(1000, 1, 2, 0xFF), 1016);
    EXPECT_EQ(log(), "new SetVersion(3,8) SetCompressFlags(1,0) GetSizeofCompressedBuffer(1000,1,0,0)");
    EXPECT_EQ(vz.sizeofCompressed(1000, 0, 1, 1), 1024);
    EXPECT_EQ(vz.sizeofCompressed(1000, 1, 1, 1), 1040);
    EXPECT_EQ(vz.sizeofCompressed(-1, 1, 1, 1), -1) << "0xFFFFFFFF, saturated, keeps its bits";
}

}  // namespace
