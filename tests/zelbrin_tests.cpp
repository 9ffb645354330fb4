// The stand-in libZelbrin.dll on its own, linked through its import library: the container,
// streams, line reads, the memory codec, corrupt and truncated input, paths and velform.
#include <gtest/gtest.h>

#include <windows.h>

#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "temp_folder.h"
#include "zelbrin.h"

namespace {

using Bytes = std::vector<unsigned char>;
using testfs::sampleData;
using testfs::TempFolder;

class Zelbrin : public ::testing::Test {
protected:
    // Writes `data` to a new Velzip file in `pieces` writes.
    void writeFile(const std::string& path, const Bytes& data, size_t pieces = 1) {
        Zel::Stream* out = Zel::File::open(path.c_str(), Zel::Stream::Write, false);
        ASSERT_NE(out, nullptr) << path;
        const size_t step = std::max<size_t>((data.size() + pieces - 1) / std::max<size_t>(pieces, 1), 1);
        for (size_t at = 0; at < data.size(); at += step) {
            out->write(data.data() + at, static_cast<unsigned>(std::min(step, data.size() - at)));
            ASSERT_EQ(out->geterror(), 0);
        }
        EXPECT_TRUE(Zel::File::close(out));
    }

    // Reads the whole file through read() calls of `chunk` bytes; error: geterror at the end.
    Bytes readFile(const std::string& path, bool lines, unsigned chunk, int* error, int* calls = nullptr) {
        Bytes all;
        Zel::Stream* in = Zel::File::open(path.c_str(), Zel::Stream::Read, lines);
        EXPECT_NE(in, nullptr) << path;
        if (in == nullptr) {
            *error = -100;
            return all;
        }
        Bytes buffer(chunk);
        int n;
        int count = 0;
        while ((n = in->read(buffer.data(), chunk)) > 0) {
            EXPECT_EQ(in->geterror(), 0);
            all.insert(all.end(), buffer.begin(), buffer.begin() + n);
            ++count;
        }
        *error = in->geterror();
        if (n < 0) {
            EXPECT_NE(*error, 0) << "a negative count comes with an error number";
        }
        if (calls != nullptr) {
            *calls = count;
        }
        Zel::File::close(in);
        return all;
    }

    Zel::FileInit init;
    TempFolder dir;
};

// ---- Container and streams ----

TEST_F(Zelbrin, EmptySmallAndMultiMegabyteFilesRoundTrip) {
    const std::vector<Bytes> samples = {Bytes{}, Bytes{'x'}, sampleData(1000, true),
                                        sampleData(3 << 20, true), sampleData(2 << 20, false)};
    for (size_t i = 0; i < samples.size(); ++i) {
        const std::string path = dir.file("round" + std::to_string(i) + ".vz");
        writeFile(path, samples[i], 7);
        int error = 0;
        EXPECT_EQ(readFile(path, false, 65536, &error), samples[i]) << "sample " << i;
        EXPECT_EQ(error, 0);
    }
}

TEST_F(Zelbrin, FileHoldsTheDocumentedHeaderAndAZlibBody) {
    const Bytes data = sampleData(50000, true);
    const std::string path = dir.file("layout.vz");
    writeFile(path, data, 3);
    const Bytes file = testfs::readAll(dir.wfile("layout.vz"));
    ASSERT_GE(file.size(), 16u);
    EXPECT_EQ(std::memcmp(file.data(),
                          "VZL\x1A"
                          "00\0\0",
                          8),
              0);
    const unsigned compressed = Zel_Compress::GetNumCompressedBytes(file.data());
    EXPECT_EQ(compressed, file.size() - 16);
    EXPECT_EQ(Zel_Compress::GetNumUnCompressedBytes(file.data()), data.size());
    EXPECT_EQ(Zel_Compress::GetNumHeaderBytes(), 16u);
    EXPECT_LT(compressed, data.size() / 2) << "text compresses";
    EXPECT_EQ(file[16], 0x78) << "a zlib stream follows the header";
}

TEST_F(Zelbrin, LineModeDeliversOneLinePerRead) {
    const std::string text = "first line\n\nthird\x01 line\nlast without end";
    const std::string path = dir.file("lines.vz");
    writeFile(path, Bytes(text.begin(), text.end()), 4);
    Zel::Stream* in = Zel::File::open(path.c_str(), Zel::Stream::Read, true);
    ASSERT_NE(in, nullptr);
    std::vector<std::string> reads;
    unsigned char buffer[2048];
    int n;
    while ((n = in->read(buffer, 2047)) > 0) {
        reads.emplace_back(reinterpret_cast<char*>(buffer), n);
    }
    EXPECT_EQ(n, 0);
    EXPECT_EQ(in->geterror(), 0);
    EXPECT_EQ(reads,
              (std::vector<std::string>{"first line\n", "\n", "third\x01 line\n", "last without end"}));
    Zel::File::close(in);
}

TEST_F(Zelbrin, LineModeStopsAtTheRequestWhenTheLineIsLonger) {
    const std::string line = std::string(5000, 'a') + "\n";
    const std::string path = dir.file("long.vz");
    writeFile(path, Bytes(line.begin(), line.end()));
    Zel::Stream* in = Zel::File::open(path.c_str(), Zel::Stream::Read, true);
    ASSERT_NE(in, nullptr);
    unsigned char buffer[2048];
    EXPECT_EQ(in->read(buffer, 2047), 2047);
    EXPECT_EQ(in->read(buffer, 2047), 2047);
    EXPECT_EQ(in->read(buffer, 2047), 5001 - 2 * 2047);
    EXPECT_EQ(buffer[5001 - 2 * 2047 - 1], '\n');
    EXPECT_EQ(in->read(buffer, 2047), 0);
    Zel::File::close(in);
}

TEST_F(Zelbrin, BlockModeFillsTheRequestAcrossLines) {
    const Bytes data = sampleData(300000, true);
    const std::string path = dir.file("blocks.vz");
    writeFile(path, data, 10);
    int error = 0, calls = 0;
    EXPECT_EQ(readFile(path, false, 65536, &error, &calls), data);
    EXPECT_EQ(calls, 5) << "300000 bytes in full 64 KiB reads";
    EXPECT_EQ(readFile(path, true, 65536, &error, &calls), data);
    EXPECT_GT(calls, 1000) << "line mode stops after each line feed";
}

TEST_F(Zelbrin, WriteOnInputAndReadOnOutputAreRefused) {
    const std::string path = dir.file("dir.vz");
    Zel::Stream* out = Zel::File::open(path.c_str(), Zel::Stream::Write, true);
    ASSERT_NE(out, nullptr);
    unsigned char b[4];
    EXPECT_EQ(out->read(b, 4), -1);
    EXPECT_EQ(out->geterror(), Zel::ErrWrongDirection);
    EXPECT_STREQ(out->get_zf_version(), "00");
    Zel::File::close(out);
    Zel::Stream* in = Zel::File::open(path.c_str(), Zel::Stream::Read, true);
    ASSERT_NE(in, nullptr);
    in->write(b, 4);
    EXPECT_EQ(in->geterror(), Zel::ErrWrongDirection);
    EXPECT_EQ(in->read(b, 4), 0) << "the empty file is still readable";
    EXPECT_EQ(in->geterror(), 0);
    Zel::File::close(in);
}

TEST_F(Zelbrin, StreamsGetDistinctFileIdsAndAnswerHeaderQueries) {
    const Bytes data = sampleData(10000, true);
    writeFile(dir.file("a.vz"), data);
    Zel::Stream* in = Zel::File::open(dir.file("a.vz").c_str(), Zel::Stream::Read, true);
    Zel::Stream* out = Zel::File::open(dir.file("b.vz").c_str(), Zel::Stream::Write, true);
    ASSERT_NE(in, nullptr);
    ASSERT_NE(out, nullptr);
    EXPECT_GE(in->getfid(), 0);
    EXPECT_GE(out->getfid(), 0);
    EXPECT_NE(in->getfid(), out->getfid());
    EXPECT_EQ(ZelTest_LiveStreams(), 2);

    const Zel::FileDesc inDesc(in->getfid()), outDesc(out->getfid());
    EXPECT_EQ(Zel_Compress::IsVelmorZipFormat(inDesc, 1), 1);
    EXPECT_EQ(Zel_Compress::IsVelmorZipFormat(outDesc, 1), 1);
    EXPECT_EQ(Zel_Compress::GetNumUnCompressedBytes(inDesc), data.size());
    EXPECT_EQ(Zel_Compress::GetNumCompressedBytes(inDesc),
              testfs::readAll(dir.wfile("a.vz")).size() - Zel_Compress::GetNumHeaderBytes());
    out->write(data.data(), 1234);
    EXPECT_EQ(Zel_Compress::GetNumUnCompressedBytes(outDesc), 1234u) << "an output stream's counts so far";

    const int gone = out->getfid();
    EXPECT_TRUE(Zel::File::close(out));
    EXPECT_EQ(Zel_Compress::IsVelmorZipFormat(Zel::FileDesc(gone), 1), 0) << "a closed id names nothing";
    EXPECT_EQ(Zel_Compress::GetNumCompressedBytes(Zel::FileDesc(gone)), 0u);
    EXPECT_EQ(Zel_Compress::IsVelmorZipFormat(Zel::FileDesc(-1), 1), 0);
    EXPECT_TRUE(Zel::File::close(in));
    EXPECT_FALSE(Zel::File::close(nullptr));
    EXPECT_EQ(ZelTest_LiveStreams(), 0);
}

// ---- Corrupt and truncated files ----

class ZelbrinDamage : public Zelbrin {
protected:
    void SetUp() override {
        data = sampleData(200000, true);
        writeFile(dir.file("good.vz"), data, 5);
        good = testfs::readAll(dir.wfile("good.vz"));
        ASSERT_GT(good.size(), 100u);
    }
    // The error met reading `bytes` as a file, with the data read before it.
    int errorOf(const Bytes& bytes, Bytes* got = nullptr) {
        EXPECT_TRUE(testfs::writeAll(dir.wfile("bad.vz"), bytes));
        int error = 0;
        Bytes read = readFile(dir.file("bad.vz"), false, 4096, &error);
        if (got != nullptr) {
            *got = read;
        }
        return error;
    }
    Bytes data, good;
};

TEST_F(ZelbrinDamage, FlippedBodyByteGivesAnError) {
    for (size_t at :
         {size_t{16}, size_t{17}, size_t{40}, good.size() / 2, good.size() - 5, good.size() - 1}) {
        Bytes bad = good;
        bad[at] ^= 0x5A;
        Bytes got;
        const int error = errorOf(bad, &got);
        EXPECT_TRUE(error == Zel::ErrCorrupt || error == Zel::ErrSizeMismatch)
            << "byte " << at << ": " << error;
        EXPECT_LE(got.size(), data.size());
    }
}

TEST_F(ZelbrinDamage, TruncatedBodyGivesTruncated) {
    for (size_t cut : {size_t{16}, size_t{17}, size_t{100}, good.size() / 2, good.size() - 1}) {
        Bytes got;
        EXPECT_EQ(errorOf(Bytes(good.begin(), good.begin() + cut), &got), Zel::ErrTruncated)
            << "cut at " << cut;
        EXPECT_TRUE(std::equal(got.begin(), got.end(), data.begin())) << "what was read is the data's start";
    }
}

TEST_F(ZelbrinDamage, WrongCountsOrTrailingBytesGiveAnError) {
    Bytes bad = good;
    bad[12] ^= 1;  // uncompressed count off by one
    EXPECT_EQ(errorOf(bad), Zel::ErrSizeMismatch);
    bad = good;
    bad[8] -= 1;  // compressed count one short: the stream wants more than the header gives
    EXPECT_EQ(errorOf(bad), Zel::ErrSizeMismatch);
    bad = good;
    bad.push_back(0);
    EXPECT_EQ(errorOf(bad), Zel::ErrCorrupt);
}

TEST_F(ZelbrinDamage, UnfinishedWriterLeavesAFileThatReadsWithAnError) {
    Bytes bad = good;
    std::memset(bad.data() + 8, 0, 8);  // counts as written at open, before close completes them
    EXPECT_NE(errorOf(bad), 0);
}

TEST_F(ZelbrinDamage, ErrorStaysAfterItIsMet) {
    Bytes bad(good.begin(), good.begin() + good.size() / 2);
    ASSERT_TRUE(testfs::writeAll(dir.wfile("bad.vz"), bad));
    Zel::Stream* in = Zel::File::open(dir.file("bad.vz").c_str(), Zel::Stream::Read, false);
    ASSERT_NE(in, nullptr);
    Bytes buffer(1 << 20);
    int n;
    while ((n = in->read(buffer.data(), 1 << 20)) > 0) {
    }
    EXPECT_EQ(n, -1);
    EXPECT_EQ(in->geterror(), Zel::ErrTruncated);
    EXPECT_EQ(in->read(buffer.data(), 10), -1);
    EXPECT_EQ(in->geterror(), Zel::ErrTruncated);
    Zel::File::close(in);
}

TEST_F(ZelbrinDamage, NotAVelzipFileDoesNotOpen) {
    for (const Bytes& bad :
         {Bytes{}, Bytes(good.begin(), good.begin() + 15), Bytes{'h', 'e', 'l', 'l', 'o'}, Bytes(100, 'x')}) {
        ASSERT_TRUE(testfs::writeAll(dir.wfile("bad.vz"), bad));
        EXPECT_TRUE(Zel::File::exist(dir.file("bad.vz").c_str()));
        EXPECT_TRUE(Zel::File::canread(dir.file("bad.vz").c_str()));
        EXPECT_EQ(Zel::File::open(dir.file("bad.vz").c_str(), Zel::Stream::Read, true), nullptr);
    }
    EXPECT_EQ(ZelTest_LiveStreams(), 0);
}

TEST_F(ZelbrinDamage, OtherVersionTextOpensButCannotBeRead) {
    for (const char* version : {"01", "", "0", "000"}) {
        Bytes bad = good;
        std::memset(bad.data() + 4, 0, 4);
        std::memcpy(bad.data() + 4, version, std::strlen(version));
        ASSERT_TRUE(testfs::writeAll(dir.wfile("enc.vz"), bad));
        Zel::Stream* in = Zel::File::open(dir.file("enc.vz").c_str(), Zel::Stream::Read, true);
        ASSERT_NE(in, nullptr);
        EXPECT_STREQ(in->get_zf_version(), version);
        unsigned char b[16];
        EXPECT_EQ(in->read(b, 16), -1);
        EXPECT_EQ(in->geterror(), Zel::ErrEncrypted);
        EXPECT_EQ(Zel_Compress::IsVelmorZipFormat(Zel::FileDesc(in->getfid()), 0), 1);
        EXPECT_EQ(Zel_Compress::IsVelmorZipFormat(Zel::FileDesc(in->getfid()), 1),
                  std::strcmp(version, "01") == 0);
        Zel::File::close(in);
    }
}

TEST_F(ZelbrinDamage, DeepFormatCheckSeesATruncatedBody) {
    ASSERT_TRUE(testfs::writeAll(dir.wfile("cut.vz"), Bytes(good.begin(), good.end() - 10)));
    Zel::Stream* in = Zel::File::open(dir.file("cut.vz").c_str(), Zel::Stream::Read, true);
    ASSERT_NE(in, nullptr);
    EXPECT_EQ(Zel_Compress::IsVelmorZipFormat(Zel::FileDesc(in->getfid()), 0), 1);
    EXPECT_EQ(Zel_Compress::IsVelmorZipFormat(Zel::FileDesc(in->getfid()), 1), 0);
    Zel::File::close(in);
}

TEST_F(Zelbrin, FailedWritesAreReportedAndTheStreamStaysFailed) {
    Zel::Stream* out = Zel::File::open(dir.file("w.vz").c_str(), Zel::Stream::Write, true);
    ASSERT_NE(out, nullptr);
    out->write(reinterpret_cast<const unsigned char*>("ok\n"), 3);
    EXPECT_EQ(out->geterror(), 0);
    ZelTest_FailWrites(Zel::ErrWrite);
    out->write(reinterpret_cast<const unsigned char*>("no\n"), 3);
    ZelTest_FailWrites(0);
    EXPECT_EQ(out->geterror(), Zel::ErrWrite);
    out->write(reinterpret_cast<const unsigned char*>("no\n"), 3);
    EXPECT_EQ(out->geterror(), Zel::ErrWrite);
    EXPECT_FALSE(Zel::File::close(out));
}

// ---- The memory codec ----

TEST_F(Zelbrin, CompressedBuffersRoundTripWithinTheBridgeBound) {
    Zel_Compress c;
    c.SetVersion(3, 8);
    c.SetCompressFlags(1, 0);
    for (size_t size : {size_t{0}, size_t{1}, size_t{100}, size_t{1024}, size_t{65536}, size_t{3 << 20}}) {
        for (bool text : {true, false}) {
            const Bytes src = sampleData(size, text);
            const unsigned bound = static_cast<unsigned>(size * 1.01 + 36.0);  // what encodeMemN asks
            Bytes packed(bound);
            const unsigned n = c.Compress(packed.data(), bound, src.data(), static_cast<unsigned>(size));
            ASSERT_GT(n, 16u) << size;
            ASSERT_LE(n, bound);
            EXPECT_EQ(Zel_Compress::GetNumCompressedBytes(packed.data()), n - 16);
            EXPECT_EQ(Zel_Compress::GetNumUnCompressedBytes(packed.data()), size);
            Bytes back(size + 1);
            EXPECT_EQ(c.UnCompress(back.data(), static_cast<unsigned>(back.size()), packed.data(), n), size);
            back.resize(size);
            EXPECT_EQ(back, src);
        }
    }
}

TEST_F(Zelbrin, CompressNeverWritesPastItsDestination) {
    Zel_Compress c;
    const Bytes src = sampleData(5000, false);
    for (unsigned dstSize : {0u, 1u, 15u, 16u, 17u, 100u, 4999u}) {
        Bytes dst(dstSize + 64, 0xEE);
        EXPECT_EQ(c.Compress(dst.data(), dstSize, src.data(), 5000), 0u) << dstSize;
        for (size_t i = dstSize; i < dst.size(); ++i) {
            ASSERT_EQ(dst[i], 0xEE) << "written past " << dstSize;
        }
    }
    Bytes dst(6000);
    EXPECT_EQ(c.Compress(nullptr, 6000, src.data(), 5000), 0u);
    EXPECT_EQ(c.Compress(dst.data(), 6000, nullptr, 5000), 0u);
}

TEST_F(Zelbrin, SettingsChooseLevelStoringAndRefuseEncryption) {
    const Bytes src = sampleData(100000, true);
    Bytes dst(200000);
    Zel_Compress c;
    c.SetVersion(3, 8);
    const unsigned level8 = c.Compress(dst.data(), 200000, src.data(), 100000);
    c.SetCompressFlags(0, 0);
    const unsigned stored = c.Compress(dst.data(), 200000, src.data(), 100000);
    EXPECT_GT(stored, 100000u);
    EXPECT_LT(level8, 50000u);
    Bytes back(100000);
    EXPECT_EQ(c.UnCompress(back.data(), 100000, dst.data(), stored), 100000u);
    EXPECT_EQ(back, src);
    c.SetCompressFlags(1, 1);
    EXPECT_EQ(c.Compress(dst.data(), 200000, src.data(), 100000), 0u);
    c.SetCompressFlags(1, 0);
    c.SetVersion(2, 8);
    EXPECT_EQ(c.Compress(dst.data(), 200000, src.data(), 100000), 0u);
}

TEST_F(Zelbrin, UnCompressRefusesDamageAndReadsNothingPastItsSource) {
    Zel_Compress c;
    const Bytes src = sampleData(20000, true);
    Bytes packed(30000);
    const unsigned n = c.Compress(packed.data(), 30000, src.data(), 20000);
    packed.resize(n);
    Bytes out(20000);
    // Every shorter prefix, each ending right before an inaccessible page.
    for (unsigned cut = 0; cut < n; cut += (cut < 64 ? 1 : 97)) {
        testfs::GuardedBuffer guarded(Bytes(packed.begin(), packed.begin() + cut));
        EXPECT_EQ(c.UnCompress(out.data(), 20000, guarded.data(), cut), 0u) << cut;
    }
    testfs::GuardedBuffer whole(packed);
    EXPECT_EQ(c.UnCompress(out.data(), 20000, whole.data(), n), 20000u);
    EXPECT_EQ(c.UnCompress(out.data(), 19999, whole.data(), n), 0u) << "destination too small";
    for (size_t at : {size_t{0}, size_t{5}, size_t{9}, size_t{13}, size_t{16}, size_t{20}, size_t{n / 2},
                      size_t{n - 1}}) {
        Bytes bad = packed;
        bad[at] ^= 0x21;
        testfs::GuardedBuffer guarded(bad);
        const unsigned got = c.UnCompress(out.data(), 20000, guarded.data(), n);
        EXPECT_EQ(got, 0u) << "byte " << at;
    }
}

TEST_F(Zelbrin, BufferSizeQueriesFollowTheirFlags) {
    EXPECT_EQ(Zel_Compress::GetSizeofCompressedBuffer(1000, 0, 0, 0), 1000u);
    EXPECT_EQ(Zel_Compress::GetSizeofCompressedBuffer(1000, 1, 0, 0), 1016u);
    EXPECT_EQ(Zel_Compress::GetSizeofCompressedBuffer(1000, 0, 1, 0), 1013u);
    EXPECT_EQ(Zel_Compress::GetSizeofCompressedBuffer(1000, 1, 1, 1), 1040u);
    EXPECT_EQ(Zel_Compress::GetSizeofCompressedBuffer(0xFFFFFFFFu, 1, 1, 1), 0xFFFFFFFFu);
    Zel_Compress c;
    const Bytes src = sampleData(999, true);
    Bytes packed(2000);
    ASSERT_GT(c.Compress(packed.data(), 2000, src.data(), 999), 0u);
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 1, 1, 0), 1000u);
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 0, 0, 0), 999u);
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 1, 1, 1), 1008u);
    packed[0] = 'X';
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 1, 1, 0), 0u);
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 0, 0, 0), 999u);
    EXPECT_EQ(Zel_Compress::GetNumCompressedBytes(packed.data()), 0u) << "no magic, no counts";
    EXPECT_EQ(Zel_Compress::GetNumUnCompressedBytes(static_cast<const unsigned char*>(nullptr)), 0u);
}

// ---- Paths, permissions and set-up ----

TEST_F(Zelbrin, NamesOutsideTheAnsiCodePageWork) {
    // "日本-é-😀": the emoji as Java's modified UTF-8 (two 3-byte surrogates) and as UTF-8.
    const std::string modified = "\xE6\x97\xA5\xE6\x9C\xAC-\xC3\xA9-\xED\xA0\xBD\xED\xB8\x80.vz";
    const std::string standard = "\xE6\x97\xA5\xE6\x9C\xAC-\xC3\xA9-\xF0\x9F\x98\x80.vz";
    const Bytes data = sampleData(1000, true);
    writeFile(dir.file(modified), data);
    EXPECT_TRUE(testfs::exists(dir.wpath() + L"\\\u65e5\u672c-\u00e9-\U0001F600.vz"));
    EXPECT_TRUE(Zel::File::exist(dir.file(standard).c_str()));
    int error = 0;
    EXPECT_EQ(readFile(dir.file(standard), false, 4096, &error), data);
    EXPECT_EQ(error, 0);
}

TEST_F(Zelbrin, MalformedPathsNameNothing) {
    writeFile(dir.file("plain.vz"), Bytes{'a'});
    for (const std::string& bad : {dir.file("pla\xC0\x80in.vz"), dir.file("\xFF.vz"),
                                   dir.file("\xED\xA0\xBD.vz"), dir.file("\xE6\x97"), std::string()}) {
        EXPECT_FALSE(Zel::File::exist(bad.c_str()));
        EXPECT_FALSE(Zel::File::canwrite(bad.c_str()));
        EXPECT_EQ(Zel::File::open(bad.c_str(), Zel::Stream::Write, true), nullptr);
    }
    EXPECT_FALSE(Zel::File::exist(nullptr));
}

TEST_F(Zelbrin, PermissionQueries) {
    const std::string file = dir.file("exists.vz");
    writeFile(file, Bytes{'a'});
    EXPECT_TRUE(Zel::File::exist(file.c_str()));
    EXPECT_TRUE(Zel::File::canread(file.c_str()));
    EXPECT_TRUE(Zel::File::canwrite(file.c_str()));

    const std::string fresh = dir.file("new.vz");
    EXPECT_FALSE(Zel::File::exist(fresh.c_str()));
    EXPECT_FALSE(Zel::File::canread(fresh.c_str()));
    EXPECT_TRUE(Zel::File::canwrite(fresh.c_str())) << "a new file in a writable folder";
    EXPECT_FALSE(testfs::exists(dir.wfile("new.vz"))) << "the probe leaves nothing behind";

    const std::string missingFolder = dir.file("no-such-folder\\x.vz");
    EXPECT_FALSE(Zel::File::canwrite(missingFolder.c_str()));
    EXPECT_EQ(Zel::File::open(missingFolder.c_str(), Zel::Stream::Write, true), nullptr);

    EXPECT_TRUE(Zel::File::exist(dir.path().c_str()));
    EXPECT_FALSE(Zel::File::canread(dir.path().c_str())) << "a folder is not a readable file";
    EXPECT_FALSE(Zel::File::canwrite(dir.path().c_str()));
}

TEST_F(Zelbrin, FileHeldWithoutSharingIsNotReadable) {
    const std::string file = dir.file("held.vz");
    writeFile(file, Bytes{'a'});
    HANDLE h = CreateFileW(dir.wfile("held.vz").c_str(), GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr);
    ASSERT_NE(h, INVALID_HANDLE_VALUE);
    EXPECT_TRUE(Zel::File::exist(file.c_str()));
    EXPECT_FALSE(Zel::File::canread(file.c_str()));
    EXPECT_FALSE(Zel::File::canwrite(file.c_str()));
    CloseHandle(h);
    EXPECT_TRUE(Zel::File::canread(file.c_str()));
}

TEST_F(Zelbrin, SecondWriterIsRefusedThoughTheFileIsWritable) {
    const std::string file = dir.file("shared.vz");
    writeFile(file, Bytes{'a'});
    HANDLE h = CreateFileW(dir.wfile("shared.vz").c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                           nullptr, OPEN_EXISTING, 0, nullptr);
    ASSERT_NE(h, INVALID_HANDLE_VALUE);
    EXPECT_TRUE(Zel::File::canwrite(file.c_str()));
    EXPECT_EQ(Zel::File::open(file.c_str(), Zel::Stream::Write, true), nullptr);
    CloseHandle(h);
    Zel::Stream* out = Zel::File::open(file.c_str(), Zel::Stream::Write, true);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(Zel::File::open(file.c_str(), Zel::Stream::Write, true), nullptr) << "one writer at a time";
    Zel::File::close(out);
}

TEST(ZelbrinSetUp, NothingWorksWithoutALiveFileInit) {
    TempFolder dir;
    const std::string file = dir.file("x.vz");
    ASSERT_EQ(ZelTest_LiveFileInits(), 0);
    EXPECT_FALSE(Zel::File::canwrite(file.c_str()));
    EXPECT_EQ(Zel::File::open(file.c_str(), Zel::Stream::Write, true), nullptr);
    {
        Zel::FileInit init;
        EXPECT_EQ(ZelTest_LiveFileInits(), 1);
        EXPECT_TRUE(Zel::File::canwrite(file.c_str()));
    }
    EXPECT_EQ(ZelTest_LiveFileInits(), 0);
    EXPECT_FALSE(Zel::File::exist(dir.path().c_str()));
}

TEST(ZelbrinSetUp, TearDownCompletesStreamsStillOpen) {
    TempFolder dir;
    const std::string file = dir.file("left-open.vz");
    const std::string text = "written but never closed\n";
    {
        Zel::FileInit init;
        Zel::Stream* out = Zel::File::open(file.c_str(), Zel::Stream::Write, true);
        ASSERT_NE(out, nullptr);
        out->write(reinterpret_cast<const unsigned char*>(text.data()), static_cast<unsigned>(text.size()));
    }
    EXPECT_EQ(ZelTest_LiveStreams(), 0);
    Zel::FileInit init;
    Zel::Stream* in = Zel::File::open(file.c_str(), Zel::Stream::Read, true);
    ASSERT_NE(in, nullptr);
    char buffer[100];
    EXPECT_EQ(in->read(reinterpret_cast<unsigned char*>(buffer), 100), static_cast<int>(text.size()));
    EXPECT_EQ(std::string(buffer, text.size()), text);
    Zel::File::close(in);
}

// ---- velform and the log ----

TEST_F(Zelbrin, VelformFormatsAnyLengthIntoItsOwnStorage) {
    EXPECT_STREQ(velform("Error: %d reading encoded input file.", -7),
                 "Error: -7 reading encoded input file.");
    const std::string path(100000, 'p');
    const char* text = velform("File %s does not exist.", path.c_str());
    ASSERT_NE(text, nullptr);
    EXPECT_EQ(std::string(text), "File " + path + " does not exist.");
    EXPECT_STREQ(velform("short %s", "again"), "short again");
}

TEST_F(Zelbrin, LogRecordsTheInterfaceCallsInOrder) {
    ZelTest_BeginLog();
    Zel_Compress* c = new Zel_Compress;
    c->SetVersion(3, 8);
    c->SetCompressFlags(1, 0);
    Zel_Compress::GetNumHeaderBytes();
    Zel_Compress::IsVelmorZipFormat(Zel::FileDesc(7), 1);
    EXPECT_STREQ(ZelTest_Log(),
                 "new SetVersion(3,8) SetCompressFlags(1,0) GetNumHeaderBytes FileDesc(7) "
                 "IsVelmorZipFormat(1)");
    ZelTest_EndLog();
    delete c;
    Zel_Compress::GetNumHeaderBytes();
    EXPECT_STREQ(ZelTest_Log(), "") << "nothing is logged after EndLog";
}

}  // namespace
