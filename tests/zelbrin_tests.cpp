// The stand-in libZelbrin.dll on its own, linked through its import library: the container,
// line reads, corrupt and truncated input, buffer safety, paths and velform. What the bridge
// relies on end to end (open failures, counts, version text, tear-down) is in velzip_tests.
#include <gtest/gtest.h>

#include <windows.h>

#include <algorithm>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "guarded_buffer.h"
#include "sample_data.h"
#include "temp_folder.h"
#include "zelbrin.h"

namespace {

using Bytes = std::vector<unsigned char>;
using testkit::sampleData;

class Zelbrin : public ::testing::Test {
protected:
    // Writes `data` to a new Velzip file in `pieces` writes.
    void writeFile(const std::string& path, const Bytes& data, size_t pieces = 1) {
        Zel::Stream* out = Zel::File::open(path.c_str(), Zel::Stream::Write, false);
        ASSERT_NE(out, nullptr) << path;
        const size_t step = std::max<size_t>((data.size() + pieces - 1) / pieces, 1);
        for (size_t at = 0; at < data.size(); at += step) {
            out->write(data.data() + at, static_cast<unsigned>(std::min(step, data.size() - at)));
            ASSERT_EQ(out->geterror(), 0);
        }
        EXPECT_TRUE(Zel::File::close(out));
    }

    // Reads the whole file in reads of up to `chunk` bytes, each one an entry of *reads;
    // geterror at the end.
    int readFile(const std::string& path, bool lines, unsigned chunk, std::vector<std::string>* reads) {
        Zel::Stream* in = Zel::File::open(path.c_str(), Zel::Stream::Read, lines);
        EXPECT_NE(in, nullptr) << path;
        if (in == nullptr) {
            return -100;
        }
        Bytes buffer(chunk);
        int n;
        while ((n = in->read(buffer.data(), chunk)) > 0) {
            EXPECT_EQ(in->geterror(), 0);
            reads->emplace_back(buffer.begin(), buffer.begin() + n);
        }
        const int error = in->geterror();
        if (n < 0) {
            EXPECT_NE(error, 0) << "a negative count comes with an error number";
            EXPECT_EQ(in->read(buffer.data(), 1), -1) << "the error stays";
            EXPECT_EQ(in->geterror(), error);
        }
        Zel::File::close(in);
        return error;
    }
    Bytes readAll(const std::string& path, int* error) {
        std::vector<std::string> reads;
        *error = readFile(path, false, 65536, &reads);
        Bytes all;
        for (const std::string& r : reads) {
            all.insert(all.end(), r.begin(), r.end());
        }
        return all;
    }

    Zel::FileInit init;
    testkit::TempFolder dir;
};

TEST_F(Zelbrin, EmptySmallAndMultiMegabyteFilesRoundTripInTheDocumentedContainer) {
    const std::vector<Bytes> samples = {Bytes{}, Bytes{'x'}, sampleData(50000, true),
                                        sampleData(3 << 20, true), sampleData(2 << 20, false)};
    for (size_t i = 0; i < samples.size(); ++i) {
        SCOPED_TRACE("sample " + std::to_string(i));
        const std::string name = "round" + std::to_string(i) + ".vz";
        writeFile(dir.file(name), samples[i], 7);
        int error = 0;
        EXPECT_EQ(readAll(dir.file(name), &error), samples[i]);
        EXPECT_EQ(error, 0);
        const Bytes file = testkit::readAll(dir.wfile(name));
        ASSERT_GT(file.size(), 16u);
        EXPECT_EQ(std::memcmp(file.data(),
                              "VZL\x1A"
                              "00\0\0",
                              8),
                  0)
            << "magic, version text";
        EXPECT_EQ(Zel_Compress::GetNumCompressedBytes(file.data()), file.size() - 16);
        EXPECT_EQ(Zel_Compress::GetNumUnCompressedBytes(file.data()), samples[i].size());
        EXPECT_EQ(file[16], 0x78) << "a zlib stream follows the header";
    }
    EXPECT_LT(testkit::readAll(dir.wfile("round2.vz")).size(), 25000u) << "text compresses";
}

TEST_F(Zelbrin, LineModeReadsStopAfterALineFeedOrAtTheRequest) {
    const std::string text = "first line\n\nthird\x01 line\n" + std::string(5000, 'a') + "\nlast without end";
    writeFile(dir.file("lines.vz"), Bytes(text.begin(), text.end()), 4);
    std::vector<std::string> reads;
    EXPECT_EQ(readFile(dir.file("lines.vz"), true, 2047, &reads), 0);
    const std::string a2047(2047, 'a');
    EXPECT_EQ(reads,
              (std::vector<std::string>{"first line\n", "\n", "third\x01 line\n", a2047, a2047,
                                        std::string(5000 - 2 * 2047, 'a') + "\n", "last without end"}));
    reads.clear();
    EXPECT_EQ(readFile(dir.file("lines.vz"), false, 2047, &reads), 0);
    EXPECT_EQ(reads.size(), 3u) << "block mode fills each request";
}

// The read-failure hook that the bridge's tests use: the bytes and their count arrive, the
// error comes with them, and the stream itself is not broken by it.
TEST_F(Zelbrin, AnInjectedReadErrorComesAfterTheBytesDelivered) {
    writeFile(dir.file("hook.vz"), Bytes{'a', 'b', '\n', 'c', '\n'});
    Zel::Stream* in = Zel::File::open(dir.file("hook.vz").c_str(), Zel::Stream::Read, true);
    ASSERT_NE(in, nullptr);
    unsigned char buffer[8] = {};
    ZelTest_FailReads(Zel::ErrRead);
    EXPECT_EQ(in->read(buffer, 8), 3);
    EXPECT_EQ(in->geterror(), Zel::ErrRead);
    EXPECT_EQ(std::memcmp(buffer, "ab\n", 3), 0);
    ZelTest_FailReads(0);
    EXPECT_EQ(in->read(buffer, 8), 2);
    EXPECT_EQ(in->geterror(), 0);
    ZelTest_FailReads(Zel::ErrRead);
    EXPECT_EQ(in->read(buffer, 8), -1) << "no bytes left: the error alone";
    EXPECT_EQ(in->geterror(), Zel::ErrRead);
    ZelTest_FailReads(0);
    Zel::File::close(in);
}

// ---- Corrupt and truncated input ----

TEST_F(Zelbrin, DamagedBodiesReadWithAnErrorNeverPastTheData) {
    const Bytes data = sampleData(200000, true);
    writeFile(dir.file("good.vz"), data, 5);
    const Bytes good = testkit::readAll(dir.wfile("good.vz"));
    struct Case {
        std::string what;
        std::function<void(Bytes&)> change;
        std::vector<int> errors;  // any of these; empty: any but 0
        bool prefix;              // what was read is the data's start (a damaged body may differ)
    };
    std::vector<Case> cases;
    for (size_t at :
         {size_t{16}, size_t{17}, size_t{40}, good.size() / 2, good.size() - 5, good.size() - 1}) {
        cases.push_back({"flipped byte " + std::to_string(at),
                         [at](Bytes& f) { f[at] ^= 0x5A; },
                         {Zel::ErrCorrupt, Zel::ErrSizeMismatch},
                         false});
    }
    for (size_t cut : {size_t{16}, size_t{17}, size_t{100}, good.size() / 2, good.size() - 1}) {
        cases.push_back(
            {"cut at " + std::to_string(cut), [cut](Bytes& f) { f.resize(cut); }, {Zel::ErrTruncated}, true});
    }
    cases.push_back(
        {"uncompressed count off by one", [](Bytes& f) { f[12] ^= 1; }, {Zel::ErrSizeMismatch}, false});
    cases.push_back(
        {"compressed count one short", [](Bytes& f) { f[8] -= 1; }, {Zel::ErrSizeMismatch}, false});
    cases.push_back({"a byte after the body", [](Bytes& f) { f.push_back(0); }, {Zel::ErrCorrupt}, true});
    // The counts as an output stream writes them at open, before close completes them.
    cases.push_back({"writer never closed", [](Bytes& f) { std::memset(f.data() + 8, 0, 8); }, {}, false});
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        Bytes bad = good;
        c.change(bad);
        ASSERT_TRUE(testkit::writeAll(dir.wfile("bad.vz"), bad));
        int error = 0;
        const Bytes got = readAll(dir.file("bad.vz"), &error);
        EXPECT_TRUE(c.errors.empty() ? error != 0
                                     : std::find(c.errors.begin(), c.errors.end(), error) != c.errors.end())
            << error;
        EXPECT_LE(got.size(), data.size());
        EXPECT_TRUE(!c.prefix || std::equal(got.begin(), got.end(), data.begin())) << "the data's start";
    }
    // Shorter than a header, or no magic: the file does not open.
    for (const Bytes& bad : {Bytes{}, Bytes(good.begin(), good.begin() + 15), Bytes(100, 'x')}) {
        ASSERT_TRUE(testkit::writeAll(dir.wfile("bad.vz"), bad));
        EXPECT_EQ(Zel::File::open(dir.file("bad.vz").c_str(), Zel::Stream::Read, true), nullptr)
            << bad.size();
    }
    EXPECT_EQ(ZelTest_LiveStreams(), 0);
}

TEST_F(Zelbrin, CodecNeverReadsOrWritesPastItsBuffers) {
    Zel_Compress c;
    const Bytes random = sampleData(5000, false);
    for (unsigned dstSize : {0u, 1u, 15u, 16u, 17u, 100u, 4999u}) {
        Bytes dst(dstSize + 64, 0xEE);
        EXPECT_EQ(c.Compress(dst.data(), dstSize, random.data(), 5000), 0u) << dstSize;
        EXPECT_EQ(std::count(dst.begin() + dstSize, dst.end(), 0xEE), 64) << "written past " << dstSize;
    }
    Bytes out(20000);
    EXPECT_EQ(c.Compress(nullptr, 6000, random.data(), 5000), 0u);
    EXPECT_EQ(c.Compress(out.data(), 6000, nullptr, 5000), 0u);

    const Bytes src = sampleData(20000, true);
    Bytes packed(30000);
    const unsigned n = c.Compress(packed.data(), 30000, src.data(), 20000);
    packed.resize(n);
    // Every shorter prefix, each ending right before an inaccessible page.
    for (unsigned cut = 0; cut < n; cut += (cut < 64 ? 1 : 97)) {
        testkit::GuardedBuffer guarded(Bytes(packed.begin(), packed.begin() + cut));
        EXPECT_EQ(c.UnCompress(out.data(), 20000, guarded.data(), cut), 0u) << cut;
    }
    testkit::GuardedBuffer whole(packed);
    EXPECT_EQ(c.UnCompress(out.data(), 20000, whole.data(), n), 20000u);
    EXPECT_EQ(out, src);
    EXPECT_EQ(c.UnCompress(out.data(), 19999, whole.data(), n), 0u) << "destination too small";
    for (size_t at : {size_t{0}, size_t{5}, size_t{9}, size_t{13}, size_t{16}, size_t{20}, size_t{n / 2},
                      size_t{n - 1}}) {
        Bytes bad = packed;
        bad[at] ^= 0x21;
        testkit::GuardedBuffer guarded(bad);
        EXPECT_EQ(c.UnCompress(out.data(), 20000, guarded.data(), n), 0u) << "byte " << at;
    }
}

TEST_F(Zelbrin, BufferSizeQueriesFollowTheirFlags) {
    EXPECT_EQ(Zel_Compress::GetSizeofCompressedBuffer(1000, 0, 0, 0), 1000u);
    EXPECT_EQ(Zel_Compress::GetSizeofCompressedBuffer(1000, 0, 1, 0), 1013u) << "zlib's bound";
    Bytes packed(2000);
    ASSERT_GT(Zel_Compress().Compress(packed.data(), 2000, sampleData(999, true).data(), 999), 0u);
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 0, 0, 0), 999u);
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 1, 1, 1), 1008u);
    packed[0] = 'X';
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 1, 1, 0), 0u) << "validated";
    EXPECT_EQ(Zel_Compress::GetSizeofUnCompressedBuffer(packed.data(), 0, 0, 0), 999u);
    EXPECT_EQ(Zel_Compress::GetNumCompressedBytes(packed.data()), 0u) << "no magic, no counts";
}

// ---- Paths and velform ----

TEST_F(Zelbrin, MalformedPathsNameNothing) {
    writeFile(dir.file("plain.vz"), Bytes{'a'});
    for (const std::string& bad : {dir.file("pla\xC0\x80in.vz"), dir.file("\xFF.vz"),
                                   dir.file("\xED\xA0\xBD.vz"), dir.file("\xE6\x97"), std::string()}) {
        EXPECT_FALSE(Zel::File::exist(bad.c_str())) << bad;
        EXPECT_FALSE(Zel::File::canwrite(bad.c_str())) << bad;
        EXPECT_EQ(Zel::File::open(bad.c_str(), Zel::Stream::Write, true), nullptr) << bad;
    }
    EXPECT_FALSE(Zel::File::exist(nullptr));
}

TEST_F(Zelbrin, PermissionQueries) {
    const std::string fresh = dir.file("new.vz");
    EXPECT_TRUE(Zel::File::canwrite(fresh.c_str())) << "a new file in a writable folder";
    EXPECT_FALSE(testkit::exists(dir.wfile("new.vz"))) << "the probe leaves nothing behind";
    EXPECT_TRUE(Zel::File::exist(dir.path().c_str()));
    EXPECT_FALSE(Zel::File::canread(dir.path().c_str())) << "a folder is not a readable file";
    EXPECT_FALSE(Zel::File::canwrite(dir.path().c_str()));
    Zel::Stream* out = Zel::File::open(fresh.c_str(), Zel::Stream::Write, true);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(Zel::File::open(fresh.c_str(), Zel::Stream::Write, true), nullptr) << "one writer at a time";
    Zel::File::close(out);
    EXPECT_TRUE(Zel::File::canwrite(fresh.c_str())) << "an existing file";
}

TEST_F(Zelbrin, VelformFormatsAnyLengthIntoItsOwnStorage) {
    EXPECT_STREQ(velform("Error: %d reading encoded input file.", -7),
                 "Error: -7 reading encoded input file.");
    const std::string path(100000, 'p');
    const char* text = velform("File %s does not exist.", path.c_str());
    ASSERT_NE(text, nullptr);
    EXPECT_EQ(std::string(text), "File " + path + " does not exist.");
    EXPECT_STREQ(velform("short %s", "again"), "short again");
}

}  // namespace
