// The Velzip container of zelbrin.h: its header, Zel_Compress's in-memory codec and header
// queries, and a stream's body codec (inflating a file as it is read, completing one written).
#include "internal.h"

#include <algorithm>
#include <cstring>

namespace Zel {

uint32_t le32(const unsigned char* p) {
    return uint32_t(p[0]) | uint32_t(p[1]) << 8 | uint32_t(p[2]) << 16 | uint32_t(p[3]) << 24;
}

void putLe32(unsigned char* p, uint32_t v) {
    for (int i = 0; i < 4; ++i) {
        p[i] = static_cast<unsigned char>(v >> (8 * i));
    }
}

void makeHeader(unsigned char* h, uint32_t compressed, uint32_t uncompressed) {
    std::memcpy(h, kMagic, 4);
    h[4] = '0';
    h[5] = '0';
    h[6] = 0;
    h[7] = 0;
    putLe32(h + 8, compressed);
    putLe32(h + 12, uncompressed);
}

bool magicMatches(const unsigned char* h) {
    return std::memcmp(h, kMagic, 4) == 0;
}

Stream::Impl::~Impl() {
    if (zReady) {
        if (output) {
            deflateEnd(&z);
        } else {
            inflateEnd(&z);
        }
    }
    if (file != kNoFile) {
        osClose(file);
    }
}

bool Stream::Impl::flushOut() {
    if (outLen == 0) {
        return true;
    }
    if (!osWriteAll(file, outBuf.data(), outLen)) {
        return false;
    }
    written += outLen;
    outLen = 0;
    return true;
}

bool Stream::Impl::startInput(const unsigned char* header, long long size) {
    if (!magicMatches(header) || inflateInit(&z) != Z_OK) {
        return false;
    }
    std::memcpy(version, header + 4, 4);
    version[4] = 0;
    headerCompressed = le32(header + 8);
    headerUncompressed = le32(header + 12);
    fileSize = size;
    return true;
}

int Stream::Impl::refill() {
    pendPos = pendLen = 0;
    if (std::strcmp(version, "00") != 0) {
        return ErrEncrypted;
    }
    while (pendLen == 0 && !streamEnd) {
        if (z.avail_in == 0) {
            const uint64_t remaining = headerCompressed - bodyRead;
            if (remaining == 0) {
                // The zlib stream wants more than the header's count.
                return fileSize < static_cast<long long>(kHeaderBytes) + headerCompressed ? ErrTruncated
                                                                                          : ErrSizeMismatch;
            }
            const long got =
                osRead(file, inBuf.data(), static_cast<size_t>(std::min<uint64_t>(remaining, kChunk)));
            if (got < 0) {
                return ErrRead;
            }
            if (got == 0) {
                return ErrTruncated;
            }
            bodyRead += static_cast<uint64_t>(got);
            z.next_in = inBuf.data();
            z.avail_in = static_cast<uInt>(got);
        }
        z.next_out = outBuf.data();
        z.avail_out = static_cast<uInt>(kChunk);
        const int r = inflate(&z, Z_NO_FLUSH);
        pendLen = kChunk - z.avail_out;
        produced += pendLen;
        if (produced > headerUncompressed) {
            pendLen = 0;
            return ErrSizeMismatch;
        }
        if (r == Z_STREAM_END) {
            streamEnd = true;
            if (z.avail_in != 0 || bodyRead != headerCompressed || produced != headerUncompressed) {
                return ErrSizeMismatch;
            }
            if (fileSize != static_cast<long long>(kHeaderBytes) + headerCompressed) {
                return ErrCorrupt;  // bytes after the body
            }
        } else if (r == Z_MEM_ERROR) {
            return ErrNoMemory;
        } else if (r != Z_OK && r != Z_BUF_ERROR) {
            pendLen = 0;
            return ErrCorrupt;
        }
    }
    return 0;
}

bool Stream::Impl::finish() {
    if (broken != 0) {
        return false;
    }
    for (;;) {
        z.next_in = nullptr;
        z.avail_in = 0;
        z.next_out = outBuf.data() + outLen;
        z.avail_out = static_cast<uInt>(kChunk - outLen);
        const int r = deflate(&z, Z_FINISH);
        outLen = kChunk - z.avail_out;
        if (r == Z_STREAM_END) {
            break;
        }
        if (r != Z_OK && r != Z_BUF_ERROR) {
            return false;
        }
        if (!flushOut()) {
            return false;
        }
    }
    if (!flushOut() || written > 0xFFFFFFFFu) {
        return false;
    }
    unsigned char header[kHeaderBytes];
    makeHeader(header, static_cast<uint32_t>(written), static_cast<uint32_t>(consumed));
    return osRewind(file) && osWriteAll(file, header, kHeaderBytes);
}

}  // namespace Zel

using namespace Zel;

Zel_Compress::Zel_Compress() : format_(3), level_(6), deflate_(1), encrypt_(0) {
    note("new");
    countCompressor();
}

void Zel_Compress::SetVersion(unsigned int format, unsigned int level) {
    notef("SetVersion(%u,%u)", static_cast<unsigned>(format), static_cast<unsigned>(level));
    format_ = format;
    level_ = level;
}

void Zel_Compress::SetCompressFlags(unsigned char deflate, unsigned char encrypt) {
    notef("SetCompressFlags(%u,%u)", static_cast<unsigned>(deflate), static_cast<unsigned>(encrypt));
    deflate_ = deflate;
    encrypt_ = encrypt;
}

unsigned int Zel_Compress::Compress(unsigned char* dst, unsigned int dstSize, const unsigned char* src,
                                    unsigned int srcSize) {
    note("Compress");
    if (dst == nullptr || (src == nullptr && srcSize != 0) || dstSize < kHeaderBytes || format_ != 3 ||
        encrypt_ != 0 || level_ > 9) {
        return 0;
    }
    z_stream z{};
    if (deflateInit(&z, deflate_ ? static_cast<int>(level_) : 0) != Z_OK) {
        return 0;
    }
    static unsigned char none = 0;
    z.next_in = const_cast<unsigned char*>(src != nullptr ? src : &none);
    z.avail_in = srcSize;
    z.next_out = dst + kHeaderBytes;
    z.avail_out = dstSize - kHeaderBytes;
    const int r = deflate(&z, Z_FINISH);
    const unsigned int body = dstSize - kHeaderBytes - z.avail_out;
    deflateEnd(&z);
    if (r != Z_STREAM_END) {
        return 0;
    }
    makeHeader(dst, body, srcSize);
    return kHeaderBytes + body;
}

unsigned int Zel_Compress::UnCompress(unsigned char* dst, unsigned int dstSize, const unsigned char* src,
                                      unsigned int srcSize) {
    note("UnCompress");
    if (dst == nullptr || src == nullptr || srcSize < kHeaderBytes || !magicMatches(src) ||
        std::memcmp(src + 4, "00\0\0", 4) != 0) {
        return 0;
    }
    const uint32_t compressed = le32(src + 8);
    const uint32_t uncompressed = le32(src + 12);
    if (compressed > srcSize - kHeaderBytes || uncompressed > dstSize) {
        return 0;
    }
    z_stream z{};
    if (inflateInit(&z) != Z_OK) {
        return 0;
    }
    z.next_in = const_cast<unsigned char*>(src + kHeaderBytes);
    z.avail_in = compressed;
    z.next_out = dst;
    z.avail_out = uncompressed;
    const int r = inflate(&z, Z_FINISH);
    const bool ok = r == Z_STREAM_END && z.avail_in == 0 && z.avail_out == 0;
    inflateEnd(&z);
    return ok ? uncompressed : 0;
}

unsigned int Zel_Compress::GetNumCompressedBytes(const unsigned char* header) {
    note("GetNumCompressedBytes(hdr)");
    return header != nullptr && magicMatches(header) ? le32(header + 8) : 0;
}

unsigned int Zel_Compress::GetNumUnCompressedBytes(const unsigned char* header) {
    note("GetNumUnCompressedBytes(hdr)");
    return header != nullptr && magicMatches(header) ? le32(header + 12) : 0;
}

unsigned int Zel_Compress::GetNumHeaderBytes() {
    note("GetNumHeaderBytes");
    return kHeaderBytes;
}

namespace {
unsigned int finishSize(uint64_t n, unsigned char align16) {
    if (align16) {
        n = (n + 15) & ~uint64_t{15};
    }
    return static_cast<unsigned int>(std::min<uint64_t>(n, 0xFFFFFFFFu));
}
}  // namespace

unsigned int Zel_Compress::GetSizeofCompressedBuffer(unsigned int size, unsigned char withHeader,
                                                     unsigned char worstCase, unsigned char align16) {
    notef("GetSizeofCompressedBuffer(%u,%u,%u,%u)", static_cast<unsigned>(size),
          static_cast<unsigned>(withHeader), static_cast<unsigned>(worstCase),
          static_cast<unsigned>(align16));
    uint64_t n = size;
    if (worstCase) {
        n += (n >> 12) + (n >> 14) + (n >> 25) + 13;  // zlib's compressBound, without overflow
    }
    if (withHeader) {
        n += kHeaderBytes;
    }
    return finishSize(n, align16);
}

unsigned int Zel_Compress::GetSizeofUnCompressedBuffer(const unsigned char* header, unsigned char validate,
                                                       unsigned char terminator, unsigned char align16) {
    notef("GetSizeofUnCompressedBuffer(%u,%u,%u)", static_cast<unsigned>(validate),
          static_cast<unsigned>(terminator), static_cast<unsigned>(align16));
    if (header == nullptr || (validate && !magicMatches(header))) {
        return 0;
    }
    uint64_t n = le32(header + 12);
    if (terminator) {
        n += 1;
    }
    return finishSize(n, align16);
}
