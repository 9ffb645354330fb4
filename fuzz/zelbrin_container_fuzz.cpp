// libFuzzer target for the Velzip container of libZelbrin.dll (zelbrin/container.cpp alone).
// Each input is a would-be Velzip file. It goes through every reader of the format:
//   - the header queries (counts and buffer sizes) on an exact 16-byte copy of its start;
//   - Zel_Compress::UnCompress with destinations a byte short, exact, a byte over and empty,
//     and once more with the input cut by one byte;
//   - an input stream's start and body decoding (what File::open and Stream::read run), with
//     whole reads, small reads, and a read that fails part way;
// and, as data, through Compress and back. Every buffer is a heap block of its exact size,
// so AddressSanitizer sees any access past it. Beyond memory safety, the readers must agree
// with zlib's own one-piece decoding of the body, and the stream must not depend on how the
// file arrives.
#include "container_alone.h"

#include <zlib.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <vector>

namespace {

using Bytes = std::vector<unsigned char>;

// Destinations and decodings larger than this are not made (a header may claim 4 GiB).
constexpr uint32_t kMaxOut = 16u << 20;

#define CHECK(cond)                                                                        \
    do {                                                                                   \
        if (!(cond)) {                                                                     \
            std::fprintf(stderr, "check failed: %s (%s:%d)\n", #cond, __FILE__, __LINE__); \
            std::abort();                                                                  \
        }                                                                                  \
    } while (0)

// A heap block of exactly `size` bytes (none for 0), holding a copy of `from` when given.
struct Block {
    std::unique_ptr<unsigned char[]> bytes;
    explicit Block(size_t size, const unsigned char* from = nullptr) : bytes(new unsigned char[size]) {
        if (from != nullptr && size != 0) {
            std::memcpy(bytes.get(), from, size);
        }
    }
    unsigned char* get() const { return bytes.get(); }
};

uint32_t field(const unsigned char* header, size_t offset) {
    uint32_t v;
    std::memcpy(&v, header + offset, 4);  // the fields are little-endian, as is this machine
    return v;
}

// The header as the format defines it, read independently of the container unit.
struct Header {
    bool velzip = false;  // the magic matches
    bool plain = false;   // and the version bytes are exactly "00" with NUL padding
    uint32_t compressed = 0;
    uint32_t uncompressed = 0;
};

Header readHeader(const Bytes& file) {
    Header h;
    if (file.size() >= Zel::kHeaderBytes) {
        h.velzip = std::memcmp(file.data(), "VZL\x1A", 4) == 0;
        h.plain = h.velzip && std::memcmp(file.data() + 4, "00\0\0", 4) == 0;
        h.compressed = field(file.data(), 8);
        h.uncompressed = field(file.data(), 12);
    }
    return h;
}

// zlib's own decoding of the body in one go: `exact` when the first `compressed` bytes after
// the header (all present) hold one complete zlib stream of exactly `uncompressed` bytes.
struct Reference {
    bool exact = false;
    Bytes data;
};

Reference decodeBody(const Bytes& file, const Header& h) {
    Reference ref;
    if (!h.velzip || h.uncompressed > kMaxOut || file.size() - Zel::kHeaderBytes < h.compressed) {
        return ref;
    }
    ref.data.resize(h.uncompressed + 1);  // one spare byte shows a body longer than its count
    uLongf produced = ref.data.size();
    uLong consumed = h.compressed;
    const int r = uncompress2(ref.data.data(), &produced, file.data() + Zel::kHeaderBytes, &consumed);
    ref.exact = r == Z_OK && consumed == h.compressed && produced == h.uncompressed;
    ref.data.resize(ref.exact ? h.uncompressed : 0);
    return ref;
}

// A buffer size query's answer for `need` bytes: at least that, rounded up to a multiple of 16
// with `align`, and 0xFFFFFFFF only where the size reaches it.
bool documentedSize(uint32_t got, uint64_t need, bool align) {
    if (got == 0xFFFFFFFFu) {
        return need + (align ? 15 : 0) >= 0xFFFFFFFFu;
    }
    return got >= need && got < need + (align ? 16 : 1) && (!align || got % 16 == 0);
}

void checkHeaderQueries(const Bytes& file, const Header& h) {
    CHECK(Zel_Compress::GetNumHeaderBytes() == Zel::kHeaderBytes);
    if (file.size() < Zel::kHeaderBytes) {
        return;
    }
    const Block header(Zel::kHeaderBytes, file.data());
    CHECK(Zel_Compress::GetNumCompressedBytes(header.get()) == (h.velzip ? h.compressed : 0));
    CHECK(Zel_Compress::GetNumUnCompressedBytes(header.get()) == (h.velzip ? h.uncompressed : 0));
    for (unsigned flags = 0; flags < 8; ++flags) {
        const unsigned char validate = flags & 1, terminator = (flags >> 1) & 1, align = flags >> 2;
        const uint32_t got =
            Zel_Compress::GetSizeofUnCompressedBuffer(header.get(), validate, terminator, align);
        if (validate && !h.velzip) {
            CHECK(got == 0);
            continue;
        }
        CHECK(documentedSize(got, uint64_t{h.uncompressed} + terminator, align));
    }
    // Either count, taken as a data size: the worst-case buffer is at least zlib's bound.
    for (const uint32_t size : {h.compressed, h.uncompressed}) {
        for (unsigned flags = 0; flags < 8; ++flags) {
            const unsigned char withHeader = flags & 1, worst = (flags >> 1) & 1, align = flags >> 2;
            const uint32_t got = Zel_Compress::GetSizeofCompressedBuffer(size, withHeader, worst, align);
            const uint64_t need = (worst ? compressBound(size) : size) + (withHeader ? Zel::kHeaderBytes : 0);
            CHECK(documentedSize(got, need, align));
        }
    }
}

// UnCompress of the first `srcSize` bytes into `dstSize` bytes: the data exactly when the
// header is plain, the body is exact and within srcSize, and the data fits.
void checkUnCompressInto(const Bytes& file, size_t srcSize, uint32_t dstSize, const Header& h,
                         const Reference& ref) {
    const Block src(srcSize, file.data());
    const Block dst(dstSize);
    const uint32_t got =
        Zel_Compress().UnCompress(dst.get(), dstSize, src.get(), static_cast<uint32_t>(srcSize));
    const bool whole = srcSize >= Zel::kHeaderBytes && srcSize - Zel::kHeaderBytes >= h.compressed;
    const bool expect = h.plain && ref.exact && whole && dstSize >= h.uncompressed;
    CHECK(got == (expect ? h.uncompressed : 0));
    CHECK(got == 0 || std::memcmp(dst.get(), ref.data.data(), got) == 0);
}

void checkUnCompress(const Bytes& file, const Header& h, const Reference& ref) {
    std::vector<uint32_t> sizes = {0, 16};
    if (h.uncompressed <= kMaxOut) {
        sizes.insert(sizes.end(), {h.uncompressed, h.uncompressed + 1});
        if (h.uncompressed > 0) {
            sizes.push_back(h.uncompressed - 1);
        }
    }
    for (const uint32_t dstSize : sizes) {
        checkUnCompressInto(file, file.size(), dstSize, h, ref);
    }
    if (!file.empty() && h.uncompressed <= kMaxOut) {
        checkUnCompressInto(file, file.size() - 1, h.uncompressed, h, ref);
    }
}

// What an input stream over the file gives: the error that ended it (0: the whole body,
// intact) and the bytes it delivered.
struct StreamRun {
    bool opened = false;
    int error = 0;
    Bytes data;
};

StreamRun readStream(const Bytes& file, size_t readLimit, size_t failAt) {
    StreamRun run;
    if (file.size() < Zel::kHeaderBytes) {
        return run;  // File::open refuses a file shorter than a header before parsing it
    }
    Zel::Stream::Impl s;
    s.inBuf.resize(Zel::kChunk);
    s.outBuf.resize(Zel::kChunk);
    const Block header(Zel::kHeaderBytes, file.data());
    if (!s.startInput(header.get(), static_cast<long long>(file.size()))) {
        return run;
    }
    s.zReady = true;
    s.file = fuzz::openMemoryFile({file.data(), file.size(), Zel::kHeaderBytes, readLimit, failAt});
    run.opened = true;
    while (run.error == 0 && !s.streamEnd) {
        run.error = s.refill();
        CHECK(s.pendPos == 0 && s.pendLen <= Zel::kChunk);
        run.data.insert(run.data.end(), s.outBuf.begin(), s.outBuf.begin() + s.pendLen);
        CHECK(run.data.size() <= s.headerUncompressed);
        CHECK(run.error != 0 || s.pendLen > 0 || s.streamEnd);
    }
    return run;
}

// Bytes a stream delivers are the file's data, even those before an error.
bool trueData(const StreamRun& run, const Reference& ref) {
    return !ref.exact || (run.data.size() <= ref.data.size() &&
                          std::equal(run.data.begin(), run.data.end(), ref.data.begin()));
}

void checkStream(const Bytes& file, const Header& h, const Reference& ref) {
    const StreamRun whole = readStream(file, 0, 0);
    CHECK(whole.opened == h.velzip);
    if (!whole.opened) {
        return;
    }
    // The version text ends at its first NUL, so "00\0x" reads as "00" too.
    const bool plainText = std::memcmp(file.data() + 4, "00", 3) == 0;
    const bool intact = plainText && ref.exact && file.size() == Zel::kHeaderBytes + uint64_t{h.compressed};
    CHECK(whole.error == 0 || plainText || whole.error == Zel::ErrEncrypted);
    CHECK(trueData(whole, ref));
    if (h.uncompressed <= kMaxOut) {  // else there is no reference decoding to compare with
        CHECK((whole.error == 0) == intact);
        CHECK(whole.error != 0 || whole.data == ref.data);
    }

    // Small reads: the same outcome.
    const StreamRun pieces = readStream(file, 1 + file.size() % 29, 0);
    CHECK(pieces.error == whole.error);
    CHECK(pieces.error != 0 || pieces.data == whole.data);
    CHECK(trueData(pieces, ref));

    // A read that fails within the body: never a success.
    const size_t bodyEnd = std::min<uint64_t>(file.size(), Zel::kHeaderBytes + uint64_t{h.compressed});
    if (plainText && bodyEnd > Zel::kHeaderBytes) {
        const size_t failAt = Zel::kHeaderBytes + 1 + file.size() % (bodyEnd - Zel::kHeaderBytes);
        const StreamRun failing = readStream(file, 1 + file.size() % 7, failAt);
        CHECK(failing.error != 0);
        CHECK(trueData(failing, ref));
    }
}

// The input as data: compressed into the worst-case buffer, it must fit and come back.
void checkCompressRoundTrip(const Bytes& data) {
    const uint32_t size = static_cast<uint32_t>(data.size());
    Zel_Compress c;
    c.SetVersion(3, size % 10);
    c.SetCompressFlags(size % 3 != 0, 0);
    const Block src(size, data.data());
    const uint32_t room = Zel_Compress::GetSizeofCompressedBuffer(size, 1, 1, 0);
    const Block packed(room);
    const uint32_t n = c.Compress(packed.get(), room, src.get(), size);
    CHECK(n >= Zel::kHeaderBytes && n <= room);
    CHECK(Zel_Compress::GetNumCompressedBytes(packed.get()) == n - Zel::kHeaderBytes);
    CHECK(Zel_Compress::GetNumUnCompressedBytes(packed.get()) == size);
    const Block back(size);
    const Block exact(n, packed.get());
    CHECK(Zel_Compress().UnCompress(back.get(), size, exact.get(), n) == size);
    CHECK(size == 0 || std::memcmp(back.get(), data.data(), size) == 0);

    // Too little room: nothing, or a complete result within it.
    const uint32_t small = n / 2 + Zel::kHeaderBytes / 2;
    const Block cramped(small);
    const uint32_t m = c.Compress(cramped.get(), small, src.get(), size);
    CHECK(m == 0 ||
          (m <= small && Zel_Compress::GetNumCompressedBytes(cramped.get()) == m - Zel::kHeaderBytes));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const Bytes file(data, data + size);
    const Header h = readHeader(file);
    const Reference ref = decodeBody(file, h);
    checkHeaderQueries(file, h);
    checkUnCompress(file, h, ref);
    checkStream(file, h, ref);
    checkCompressRoundTrip(file);
    return 0;
}
