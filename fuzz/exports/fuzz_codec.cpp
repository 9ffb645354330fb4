// The VelzipFile calls that need no open file, under fuzz: the in-memory codec with sizes at
// and around its bounds (one array as source and destination too), the header queries on
// null, short, damaged and whole headers, and the buffer-size queries with odd flag values.
#include <cstring>

#include "fuzz_case.h"
#include "fuzz_run.h"
#include "velzip/size_bounds.h"
#include "velzip_client.h"
#include "velzip_model.h"

namespace fuzz {

namespace {

namespace vz = testkit::vz;

uint32_t saturate(uint64_t n) {
    return n > 0xFFFFFFFFull ? 0xFFFFFFFFu : static_cast<uint32_t>(n);
}
uint64_t align16(uint64_t n) {
    return (n + 15) / 16 * 16;
}

// A header for the byte-array queries: null, shorter than a header, random, or the first
// bytes of a corpus file.
jbyteArray anyHeader(Case& c, const Run& run, Bytes* bytes) {
    switch (c.rng.below(6)) {
        case 0:
            bytes->clear();
            return nullptr;
        case 1:
            *bytes = randomBytes(c.rng, c.rng.below(16));
            break;
        case 2:
            *bytes = randomBytes(c.rng, c.rng.range(16, 40));
            if (c.rng.chance(50)) {
                std::memcpy(bytes->data(), "VZL\x1a", 4);
            }
            break;
        default: {
            const FileImage& f = c.rng.pick(run.corpus);
            *bytes = Bytes(f.bytes.begin(),
                           f.bytes.begin() + std::min<size_t>(f.bytes.size(), c.rng.range(0, 64)));
        }
    }
    return c.vm.newByteArray(*bytes);
}

jboolean anyFlag(Case& c) {
    static const jboolean values[] = {0, 1, 1, 2, 0x80, 0xFF};
    return values[c.rng.below(6)];
}

}  // namespace

std::u16string velzipMessage(int id, const std::u16string& path, int number) {
    const std::string digits = std::to_string(number);
    const std::u16string n(digits.begin(), digits.end());
    switch (id) {
        case 1:
            return u"NULL file path detected.\n";
        case 2:
            return u"File path is the empty string.\n";
        case 3:
            return u"Failure to open file " + path + u" for read.";
        case 4:
            return u"File " + path + u" does not have read permissions.";
        case 5:
            return u"File " + path + u" does not exist.";
        case 6:
            return u"Failure to open file " + path + u" for write.";
        case 7:
            return u"Cannot write to file " + path + u".";
        case 8:
            return u"Output stream has not been initialized.";
        case 9:
            return u"Input stream has not been initialized.";
        case 11:
            return u"Input stream buffer overrun. End of line not reached.";
        case 12:
            return u"Error writing encoded output file: " + n;
        case 13:
            return u"Error: " + n + u" reading encoded input file.";
        case 14:
            return u"Incorrect buffer sizes specified.";
        default:
            return u"";
    }
}

bool hasMagic(const uint8_t* header) {
    return std::memcmp(header, "VZL\x1a", 4) == 0;
}

uint32_t le32(const uint8_t* b) {
    return uint32_t{b[0]} | uint32_t{b[1]} << 8 | uint32_t{b[2]} << 16 | uint32_t{b[3]} << 24;
}

std::string versionText(const uint8_t* header) {
    return std::string(reinterpret_cast<const char*>(header + 4),
                       strnlen(reinterpret_cast<const char*>(header + 4), 4));
}

void opHeaderQueries(Case& c, const Run& run, VelzipModel&) {
    Bytes header;
    jbyteArray array = anyHeader(c, run, &header);
    const bool full = array != nullptr && header.size() >= 16;
    const bool magic = full && hasMagic(header.data());
    const char* name = nullptr;
    uint32_t want = 0;
    switch (c.rng.below(5)) {
        case 0:
            name = vz::kCompressedOfHeader;
            want = magic ? le32(&header[8]) : 0;
            break;
        case 1:
            name = vz::kUncompressedOfHeader;
            want = magic ? le32(&header[12]) : 0;
            break;
        case 2:
            name = vz::kSizeofUnCompressed;
            want = magic ? saturate(uint64_t{le32(&header[12])} + 1) : 0;
            break;
        case 3: {
            const jint got = c.call<jint>(vz::kHeaderBytes);
            c.expect(got == 16, [&] { return "getNumHeaderBytesN gave " + std::to_string(got); });
            return;
        }
        default: {
            const jint size =
                c.rng.chance(50) ? static_cast<jint>(c.rng.next()) : static_cast<jint>(c.rng.below(5000));
            const jboolean f1 = anyFlag(c), f2 = anyFlag(c), f3 = anyFlag(c);
            uint64_t n = static_cast<uint32_t>(size);
            if (f2 == 1) {
                n += (n >> 12) + (n >> 14) + (n >> 25) + 13;
            }
            n += f1 == 1 ? 16 : 0;
            const uint32_t expected = saturate(f3 == 1 ? align16(n) : n);
            const jint got = c.call<jint>(vz::kSizeofCompressed, size, f1, f2, f3);
            c.expect(static_cast<uint32_t>(got) == expected, [&] {
                return "getSizeofCompressedBuffer(" + std::to_string(size) + ", " + std::to_string(f1) +
                       ", " + std::to_string(f2) + ", " + std::to_string(f3) + ") gave " +
                       std::to_string(got) + ", expected " + std::to_string(expected);
            });
            return;
        }
    }
    const jint got = c.call<jint>(name, array);
    c.expect(static_cast<uint32_t>(got) == want, [&] {
        return std::string(name) + "(" + (array ? showBytes(header) : "null") + ") gave " +
               std::to_string(got) + ", expected " + std::to_string(want);
    });
    if (array != nullptr) {
        c.expect(c.vm.byteArrayValue(array) == header,
                 [&] { return std::string(name) + " changed its header array"; });
    }
}

// encodeMemN or decodeMemN with sizes at, around and far from the bounds; the source is data
// to compress, a whole container, a damaged one, or random bytes.
void opCodec(Case& c, VelzipModel& m) {
    const bool encode = c.rng.chance(50);
    const std::string text = modifiedUtf8(anyText(c.rng));
    Bytes data = c.rng.chance(50) ? randomBytes(c.rng, c.rng.below(4000)) : Bytes(text.begin(), text.end());
    Bytes source = data;
    if (!encode && c.rng.chance(75)) {
        source = container(data);
        if (c.rng.chance(25) && !source.empty()) {
            source.resize(c.rng.below(static_cast<uint32_t>(source.size())));  // cut short
        }
    }
    jbyteArray src = c.rng.chance(4) ? nullptr : c.vm.newByteArray(source);
    jint srcSize = c.rng.chance(80) ? static_cast<jint>(source.size())
                                    : anyLength(c.rng, static_cast<jint>(source.size()));
    // Around the bound that the size check computes, or anywhere.
    const int64_t bound = encode ? static_cast<int64_t>(srcSize * 1.01 + 36.0)
                                 : static_cast<int64_t>(data.size() * 1.01 + 37.0);
    jint dstSize =
        c.rng.chance(70)
            ? static_cast<jint>(std::max<int64_t>(0, std::min<int64_t>(bound + c.rng.range(-2, 64), 1 << 24)))
            : anyLength(c.rng, static_cast<jint>(source.size() * 2 + 64));
    const bool sameArray = src != nullptr && c.rng.chance(10);
    Bytes dstBefore = sameArray
                          ? source
                          : randomBytes(c.rng, dstSize > 0 && dstSize < (1 << 24) ? dstSize + c.rng.below(8)
                                                                                  : c.rng.below(64));
    jbyteArray dst = sameArray ? src : c.rng.chance(4) ? nullptr : c.vm.newByteArray(dstBefore);
    if (sameArray) {
        srcSize = static_cast<jint>(
            std::min<size_t>(static_cast<size_t>(std::max<jint>(srcSize, 0)), source.size()));
    }

    const jint got = c.call<jint>(encode ? vz::kEncode : vz::kDecode, dst, dstSize, src, srcSize);
    const bool fits =
        src && dst && srcSize >= 0 && dstSize >= 0 && static_cast<size_t>(srcSize) <= source.size() &&
        static_cast<size_t>(dstSize) <= dstBefore.size() &&
        (encode ? velzip::encodeSizesFit(dstSize, srcSize) : velzip::decodeSizesFit(dstSize, srcSize));
    const Bytes dstAfter = dst ? c.vm.byteArrayValue(dst) : Bytes();
    auto report = [&](const std::string& what) {
        return std::string(encode ? "encodeMemN" : "decodeMemN") + "(dst " +
               (dst ? showBytes(dstBefore) : "null") + ", " + std::to_string(dstSize) + ", src " +
               (src ? showBytes(source) : "null") + ", " + std::to_string(srcSize) +
               (sameArray ? ", one array" : "") + ") gave " + std::to_string(got) + ": " + what;
    };
    if (!fits) {
        c.expect(got == 0 && dstAfter == (dst ? dstBefore : Bytes()),
                 [&] { return report("expected a refusal"); });
        m.record(14, velzipMessage(14));
        return;
    }
    c.expect(got >= 0 && got <= dstSize, [&] { return report("a count beyond the destination"); });
    const Bytes in(source.begin(), source.begin() + srcSize);
    const Bytes out(dstAfter.begin(), dstAfter.begin() + std::max<jint>(0, std::min<jint>(got, dstSize)));
    if (encode) {
        Bytes back;
        c.expect(got > 0 && uncontainer(out, &back) && back == in,
                 [&] { return report("output does not decode to the source"); });
    } else {
        Bytes whole;
        const bool intact = uncontainer(in, &whole);
        const bool room = whole.size() <= static_cast<size_t>(dstSize);
        c.expect(intact && room ? got == static_cast<jint>(whole.size()) && out == whole : got == 0, [&] {
            return report(intact ? "expected the data back" : "expected 0 for a damaged source");
        });
    }
    if (!sameArray) {
        c.expect(std::equal(dstAfter.begin() + out.size(), dstAfter.end(), dstBefore.begin() + out.size()),
                 [&] { return report("destination changed past the output"); });
        c.expect(c.vm.byteArrayValue(src) == source, [&] { return report("source array changed"); });
    }
}

}  // namespace fuzz
