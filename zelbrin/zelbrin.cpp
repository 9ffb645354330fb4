// The stand-in libZelbrin.dll: the Velzip container of zelbrin.h over zlib, files through
// the wide-character Windows API (POSIX calls elsewhere), and the test observation hooks.
#include "zelbrin.h"

#include <zlib.h>

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <mutex>
#include <new>
#include <string>
#include <vector>

#if defined(_WIN32)
#include <windows.h>
#else
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#endif

namespace {

constexpr unsigned kHeaderBytes = 16;
constexpr unsigned char kMagic[4] = {'V', 'Z', 'L', 0x1A};
constexpr size_t kChunk = 64 * 1024;
enum { ErrArgument = 12 };  // a null buffer with a non-zero count

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

// ---- The observation log ----
std::mutex logMutex;
bool logging = false;
std::string logText;
std::string logCopy;
int compressorsCreated = 0;
int failWritesWith = 0;
int failReadsWith = 0;

// The log only serves tests: a failure to grow it is dropped rather than thrown across the
// DLL boundary, where an exception cannot pass.
void note(const char* entry) noexcept {
    std::lock_guard<std::mutex> lock(logMutex);
    if (logging) {
        try {
            if (!logText.empty()) {
                logText += ' ';
            }
            logText += entry;
        } catch (const std::bad_alloc&) {
        }
    }
}

// A log entry with numbers in it, formatted without the heap.
void notef(const char* format, ...) noexcept {
    char entry[96];
    va_list args;
    va_start(args, format);
    std::vsnprintf(entry, sizeof entry, format, args);
    va_end(args);
    note(entry);
}

// ---- Paths: (modified) UTF-8 to the platform's form ----

// Decodes NUL-terminated modified UTF-8 (surrogates as separate 3-byte sequences, as Java
// gives them) or standard UTF-8 into UTF-16 units. False for a malformed text, an encoded
// NUL, an unpaired surrogate or an empty text.
bool decodeUtf8(const char* text, std::u16string& out) {
    out.clear();
    if (text == nullptr) {
        return false;
    }
    auto* p = reinterpret_cast<const unsigned char*>(text);
    auto cont = [](unsigned char c) { return (c & 0xC0) == 0x80; };
    while (*p != 0) {
        uint32_t c = *p;
        if (c < 0x80) {
            out.push_back(static_cast<char16_t>(c));
            p += 1;
        } else if ((c & 0xE0) == 0xC0 && cont(p[1])) {
            c = (c & 0x1F) << 6 | (p[1] & 0x3F);
            if (c < 0x80) {
                return false;  // overlong, or C0 80: a NUL cannot be part of a path
            }
            out.push_back(static_cast<char16_t>(c));
            p += 2;
        } else if ((c & 0xF0) == 0xE0 && cont(p[1]) && cont(p[2])) {
            c = (c & 0x0F) << 12 | (p[1] & 0x3F) << 6 | (p[2] & 0x3F);
            if (c < 0x800) {
                return false;
            }
            out.push_back(static_cast<char16_t>(c));
            p += 3;
        } else if ((c & 0xF8) == 0xF0 && cont(p[1]) && cont(p[2]) && cont(p[3])) {
            c = (c & 0x07) << 18 | (p[1] & 0x3F) << 12 | (p[2] & 0x3F) << 6 | (p[3] & 0x3F);
            if (c < 0x10000 || c > 0x10FFFF) {
                return false;
            }
            out.push_back(static_cast<char16_t>(0xD800 + ((c - 0x10000) >> 10)));
            out.push_back(static_cast<char16_t>(0xDC00 + ((c - 0x10000) & 0x3FF)));
            p += 4;
        } else {
            return false;
        }
    }
    for (size_t i = 0; i < out.size(); ++i) {
        const char16_t u = out[i];
        if (u >= 0xD800 && u < 0xDC00) {
            if (i + 1 >= out.size() || out[i + 1] < 0xDC00 || out[i + 1] >= 0xE000) {
                return false;
            }
            ++i;
        } else if (u >= 0xDC00 && u < 0xE000) {
            return false;
        }
    }
    return !out.empty();
}

// ---- The platform's files ----
#if defined(_WIN32)

struct NativePath {
    std::wstring text;
    bool ok = false;
    // A path too long to copy counts as one that cannot be decoded: no exception leaves the DLL.
    explicit NativePath(const char* path) noexcept {
        try {
            std::u16string units;
            ok = decodeUtf8(path, units);
            text.assign(units.begin(), units.end());
        } catch (const std::bad_alloc&) {
            ok = false;
        }
    }
    const wchar_t* c_str() const { return text.c_str(); }
};

using OsFile = HANDLE;
const OsFile kNoFile = INVALID_HANDLE_VALUE;

bool osExists(const NativePath& p) {
    return GetFileAttributesW(p.c_str()) != INVALID_FILE_ATTRIBUTES;
}

bool osIsFolder(const NativePath& p) {
    const DWORD a = GetFileAttributesW(p.c_str());
    return a != INVALID_FILE_ATTRIBUTES && (a & FILE_ATTRIBUTE_DIRECTORY);
}

bool osCanRead(const NativePath& p) {
    if (!osExists(p) || osIsFolder(p)) {
        return false;
    }
    HANDLE h = CreateFileW(p.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                           OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
    if (h == INVALID_HANDLE_VALUE) {
        return false;
    }
    CloseHandle(h);
    return true;
}

bool osCanWrite(const NativePath& p) {
    if (osExists(p)) {
        if (osIsFolder(p)) {
            return false;
        }
        HANDLE h =
            CreateFileW(p.c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE,
                        nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
        if (h == INVALID_HANDLE_VALUE) {
            return false;
        }
        CloseHandle(h);
        return true;
    }
    // A new file: create it and let the system delete it again. Fails when the folder is
    // missing or refuses new files.
    HANDLE h = CreateFileW(p.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_NEW,
                           FILE_ATTRIBUTE_TEMPORARY | FILE_FLAG_DELETE_ON_CLOSE, nullptr);
    if (h == INVALID_HANDLE_VALUE) {
        return false;
    }
    CloseHandle(h);
    return true;
}

OsFile osOpenRead(const NativePath& p) {
    return CreateFileW(p.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                       FILE_ATTRIBUTE_NORMAL | FILE_FLAG_SEQUENTIAL_SCAN, nullptr);
}

// Readers may share the file while it is written; another writer may not.
OsFile osOpenWrite(const NativePath& p) {
    return CreateFileW(p.c_str(), GENERIC_WRITE, FILE_SHARE_READ, nullptr, CREATE_ALWAYS,
                       FILE_ATTRIBUTE_NORMAL, nullptr);
}

long long osSize(OsFile f) {
    LARGE_INTEGER size;
    return GetFileSizeEx(f, &size) ? size.QuadPart : -1;
}

// Bytes read (0 at the end), or -1.
long osRead(OsFile f, unsigned char* buffer, size_t count) {
    DWORD got = 0;
    if (!ReadFile(f, buffer, static_cast<DWORD>(count), &got, nullptr)) {
        return -1;
    }
    return static_cast<long>(got);
}

bool osWriteAll(OsFile f, const unsigned char* data, size_t count) {
    while (count > 0) {
        DWORD done = 0;
        if (!WriteFile(f, data, static_cast<DWORD>(std::min<size_t>(count, 1u << 30)), &done, nullptr) ||
            done == 0) {
            return false;
        }
        data += done;
        count -= done;
    }
    return true;
}

bool osRewind(OsFile f) {
    return SetFilePointer(f, 0, nullptr, FILE_BEGIN) != INVALID_SET_FILE_POINTER;
}

bool osClose(OsFile f) {
    return CloseHandle(f) != 0;
}

#else

struct NativePath {
    std::string text;
    bool ok = false;
    explicit NativePath(const char* path) {
        std::u16string units;
        ok = decodeUtf8(path, units);
        for (size_t i = 0; ok && i < units.size(); ++i) {
            uint32_t c = units[i];
            if (c >= 0xD800 && c < 0xDC00) {
                c = 0x10000 + ((c - 0xD800) << 10) + (units[++i] - 0xDC00);
            }
            if (c < 0x80) {
                text.push_back(static_cast<char>(c));
            } else if (c < 0x800) {
                text.push_back(static_cast<char>(0xC0 | c >> 6));
                text.push_back(static_cast<char>(0x80 | (c & 0x3F)));
            } else if (c < 0x10000) {
                text.push_back(static_cast<char>(0xE0 | c >> 12));
                text.push_back(static_cast<char>(0x80 | ((c >> 6) & 0x3F)));
                text.push_back(static_cast<char>(0x80 | (c & 0x3F)));
            } else {
                text.push_back(static_cast<char>(0xF0 | c >> 18));
                text.push_back(static_cast<char>(0x80 | ((c >> 12) & 0x3F)));
                text.push_back(static_cast<char>(0x80 | ((c >> 6) & 0x3F)));
                text.push_back(static_cast<char>(0x80 | (c & 0x3F)));
            }
        }
    }
    const char* c_str() const { return text.c_str(); }
};

using OsFile = int;
const OsFile kNoFile = -1;

bool osExists(const NativePath& p) {
    struct stat st;
    return stat(p.c_str(), &st) == 0;
}

bool osIsFolder(const NativePath& p) {
    struct stat st;
    return stat(p.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

bool osCanRead(const NativePath& p) {
    if (!osExists(p) || osIsFolder(p)) {
        return false;
    }
    const int fd = ::open(p.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        return false;
    }
    ::close(fd);
    return true;
}

bool osCanWrite(const NativePath& p) {
    if (osExists(p)) {
        return !osIsFolder(p) && access(p.c_str(), W_OK) == 0;
    }
    const int fd = ::open(p.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    if (fd < 0) {
        return false;
    }
    ::close(fd);
    ::unlink(p.c_str());
    return true;
}

OsFile osOpenRead(const NativePath& p) {
    if (osIsFolder(p)) {
        return -1;
    }
    return ::open(p.c_str(), O_RDONLY | O_CLOEXEC);
}

OsFile osOpenWrite(const NativePath& p) {
    return ::open(p.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
}

long long osSize(OsFile f) {
    struct stat st;
    return fstat(f, &st) == 0 ? static_cast<long long>(st.st_size) : -1;
}

long osRead(OsFile f, unsigned char* buffer, size_t count) {
    const ssize_t got = ::read(f, buffer, count);
    return got < 0 ? -1 : static_cast<long>(got);
}

bool osWriteAll(OsFile f, const unsigned char* data, size_t count) {
    while (count > 0) {
        const ssize_t done = ::write(f, data, count);
        if (done <= 0) {
            return false;
        }
        data += done;
        count -= static_cast<size_t>(done);
    }
    return true;
}

bool osRewind(OsFile f) {
    return lseek(f, 0, SEEK_SET) == 0;
}

bool osClose(OsFile f) {
    return ::close(f) == 0;
}

#endif

// Reads exactly `count` bytes unless the file ends; the count read, or -1.
long osReadFull(OsFile f, unsigned char* buffer, size_t count) {
    size_t total = 0;
    while (total < count) {
        const long got = osRead(f, buffer + total, count - total);
        if (got < 0) {
            return -1;
        }
        if (got == 0) {
            break;
        }
        total += static_cast<size_t>(got);
    }
    return static_cast<long>(total);
}

}  // namespace

namespace Zel {

struct Stream::Impl {
    OsFile file = kNoFile;
    bool output = false;
    bool lines = false;
    int fid = -1;
    int error = 0;     // result of the last read or write
    int broken = 0;    // the first failure; the stream stays failed
    int deferred = 0;  // a failure met after bytes that a read still delivers
    char version[5] = {'0', '0', 0, 0, 0};
    z_stream z{};
    bool zReady = false;
    std::vector<unsigned char> inBuf, outBuf;

    // Input.
    uint32_t headerCompressed = 0;
    uint32_t headerUncompressed = 0;
    long long fileSize = 0;
    uint64_t bodyRead = 0;
    uint64_t produced = 0;
    bool streamEnd = false;
    size_t pendPos = 0, pendLen = 0;

    // Output.
    size_t outLen = 0;
    uint64_t consumed = 0;
    uint64_t written = 0;  // compressed bytes handed to the file

    ~Impl() {
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

    bool flushOut() {
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

    // Decodes the next piece of the body into outBuf (used as the decoded buffer on input).
    // Returns 0, or the failure met; bytes decoded before a failure stay deliverable.
    int refill() {
        pendPos = pendLen = 0;
        if (std::strcmp(version, "00") != 0) {
            return ErrEncrypted;
        }
        while (pendLen == 0 && !streamEnd) {
            if (z.avail_in == 0) {
                const uint64_t remaining = headerCompressed - bodyRead;
                if (remaining == 0) {
                    // The zlib stream wants more than the header's count.
                    return fileSize < static_cast<long long>(kHeaderBytes) + headerCompressed
                               ? ErrTruncated
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

    bool finish() {
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
};

// The table of open streams by file id, and the live FileInit objects.
struct Registry {
    std::mutex mutex;
    std::vector<Stream*> byFid;
    int liveInits = 0;

    int add(Stream* s) {
        std::lock_guard<std::mutex> lock(mutex);
        for (size_t i = 0; i < byFid.size(); ++i) {
            if (byFid[i] == nullptr) {
                byFid[i] = s;
                return static_cast<int>(i);
            }
        }
        byFid.push_back(s);
        return static_cast<int>(byFid.size() - 1);
    }

    bool remove(Stream* s) {
        std::lock_guard<std::mutex> lock(mutex);
        const int fid = s->impl_->fid;
        if (fid < 0 || static_cast<size_t>(fid) >= byFid.size() || byFid[fid] != s) {
            return false;
        }
        byFid[fid] = nullptr;
        return true;
    }

    Stream::Impl* find(int fid) {
        std::lock_guard<std::mutex> lock(mutex);
        if (fid < 0 || static_cast<size_t>(fid) >= byFid.size() || byFid[fid] == nullptr) {
            return nullptr;
        }
        return byFid[fid]->impl_;
    }

    int live() {
        std::lock_guard<std::mutex> lock(mutex);
        return static_cast<int>(
            std::count_if(byFid.begin(), byFid.end(), [](Stream* s) { return s != nullptr; }));
    }

    bool ready() {
        std::lock_guard<std::mutex> lock(mutex);
        return liveInits > 0;
    }

    static Registry& get() {
        static Registry* registry = new Registry;  // never destroyed: streams may outlive statics
        return *registry;
    }

    static void destroy(Stream* s) { delete s; }
};

Stream::Stream(Impl* impl) : impl_(impl) {}
Stream::~Stream() {
    delete impl_;
}

int Stream::getfid() {
    note("getfid");
    return impl_->fid;
}

int Stream::read(unsigned char* buffer, unsigned int count) {
    note("read");
    Impl& s = *impl_;
    if (s.output) {
        s.error = ErrWrongDirection;
        return -1;
    }
    if (s.broken != 0) {
        s.error = s.broken;
        return -1;
    }
    if (count == 0) {
        s.error = 0;
        return 0;
    }
    if (buffer == nullptr) {
        s.error = ErrArgument;
        return -1;
    }
    if (count > 0x7FFFFFFFu) {
        count = 0x7FFFFFFFu;  // the count returned is an int
    }
    unsigned int placed = 0;
    while (placed < count) {
        if (s.pendPos == s.pendLen) {
            if (s.deferred != 0 || s.streamEnd) {
                break;
            }
            s.deferred = s.refill();
            continue;
        }
        size_t take = std::min<size_t>(count - placed, s.pendLen - s.pendPos);
        const unsigned char* from = s.outBuf.data() + s.pendPos;
        if (s.lines) {
            const void* lf = std::memchr(from, '\n', take);
            if (lf != nullptr) {
                take = static_cast<const unsigned char*>(lf) - from + 1;
            }
        }
        std::memcpy(buffer + placed, from, take);
        s.pendPos += take;
        placed += static_cast<unsigned int>(take);
        if (s.lines && buffer[placed - 1] == '\n') {
            break;
        }
    }
    if (placed == 0 && s.deferred != 0) {
        s.broken = s.error = s.deferred;
        return -1;
    }
    // A read error injected by a test arrives after the bytes, as a disk error can: the
    // count delivered stands and geterror reports the number.
    s.error = failReadsWith;
    return placed == 0 && failReadsWith != 0 ? -1 : static_cast<int>(placed);
}

void Stream::write(const unsigned char* data, unsigned int count) {
    note("write");
    Impl& s = *impl_;
    if (!s.output) {
        s.error = ErrWrongDirection;
        return;
    }
    if (s.broken == 0 && failWritesWith != 0) {
        s.broken = failWritesWith;
    }
    if (s.broken != 0) {
        s.error = s.broken;
        return;
    }
    if (count == 0) {
        s.error = 0;
        return;
    }
    if (data == nullptr) {
        s.error = ErrArgument;
        return;
    }
    if (s.consumed + count > 0xFFFFFFFFu) {
        s.broken = s.error = ErrTooLarge;
        return;
    }
    s.z.next_in = const_cast<unsigned char*>(data);
    s.z.avail_in = count;
    do {
        s.z.next_out = s.outBuf.data() + s.outLen;
        s.z.avail_out = static_cast<uInt>(kChunk - s.outLen);
        const int r = deflate(&s.z, Z_NO_FLUSH);
        if (r != Z_OK && r != Z_BUF_ERROR) {
            s.broken = s.error = ErrCorrupt;
            return;
        }
        s.outLen = kChunk - s.z.avail_out;
        if (s.outLen == kChunk && !s.flushOut()) {
            s.broken = s.error = ErrWrite;
            return;
        }
    } while (s.z.avail_in > 0 || s.z.avail_out == 0);
    s.consumed += count;
    s.error = 0;
}

int Stream::geterror() {
    note("geterror");
    return impl_->error;
}

const char* Stream::get_zf_version() {
    note("get_zf_version");
    return impl_->version;
}

bool File::exist(const char* path) {
    note("exist");
    const NativePath p(path);
    return Registry::get().ready() && p.ok && osExists(p);
}

bool File::canread(const char* path) {
    note("canread");
    const NativePath p(path);
    return Registry::get().ready() && p.ok && osCanRead(p);
}

bool File::canwrite(const char* path) {
    note("canwrite");
    const NativePath p(path);
    return Registry::get().ready() && p.ok && osCanWrite(p);
}

Stream* File::open(const char* path, Stream::Access access, bool lines) {
    notef("open(%d,%d)", static_cast<int>(access), lines ? 1 : 0);
    const NativePath p(path);
    if (!Registry::get().ready() || !p.ok || (access != Stream::Read && access != Stream::Write)) {
        return nullptr;
    }
    auto* impl = new (std::nothrow) Stream::Impl;
    if (impl == nullptr) {
        return nullptr;
    }
    impl->output = access == Stream::Write;
    impl->lines = lines;
    try {
        impl->inBuf.resize(impl->output ? 0 : kChunk);
        impl->outBuf.resize(kChunk);
    } catch (const std::bad_alloc&) {
        delete impl;
        return nullptr;
    }
    if (impl->output) {
        impl->file = osOpenWrite(p);
        unsigned char header[kHeaderBytes];
        makeHeader(header, 0, 0);
        if (impl->file == kNoFile || !osWriteAll(impl->file, header, kHeaderBytes) ||
            deflateInit(&impl->z, Z_DEFAULT_COMPRESSION) != Z_OK) {
            delete impl;
            return nullptr;
        }
    } else {
        impl->file = osOpenRead(p);
        unsigned char header[kHeaderBytes];
        if (impl->file == kNoFile || osReadFull(impl->file, header, kHeaderBytes) != kHeaderBytes ||
            !magicMatches(header) || inflateInit(&impl->z) != Z_OK) {
            delete impl;
            return nullptr;
        }
        std::memcpy(impl->version, header + 4, 4);
        impl->version[4] = 0;
        impl->headerCompressed = le32(header + 8);
        impl->headerUncompressed = le32(header + 12);
        impl->fileSize = osSize(impl->file);
    }
    impl->zReady = true;
    auto* stream = new (std::nothrow) Stream(impl);
    if (stream == nullptr) {
        delete impl;
        return nullptr;
    }
    try {
        impl->fid = Registry::get().add(stream);
    } catch (const std::bad_alloc&) {
        delete stream;  // closes the file it opened
        return nullptr;
    }
    return stream;
}

bool File::close(Stream* stream) {
    note("close");
    if (stream == nullptr || !Registry::get().remove(stream)) {
        return false;
    }
    bool ok = true;
    if (stream->impl_->output) {
        ok = stream->impl_->finish();
    }
    ok = osClose(stream->impl_->file) && ok;
    stream->impl_->file = kNoFile;
    Registry::destroy(stream);
    return ok;
}

FileDesc::FileDesc(int fid) : fid_(fid) {
    notef("FileDesc(%d)", static_cast<int>(fid));
}

FileInit::FileInit() {
    note("FileInit");
    Registry& r = Registry::get();
    std::lock_guard<std::mutex> lock(r.mutex);
    ++r.liveInits;
}

FileInit::~FileInit() {
    note("~FileInit");
    Registry& r = Registry::get();
    std::vector<Stream*> open;
    {
        std::lock_guard<std::mutex> lock(r.mutex);
        if (--r.liveInits > 0) {
            return;
        }
        for (Stream* s : r.byFid) {
            if (s != nullptr) {
                open.push_back(s);
            }
        }
    }
    // The library goes down: complete and close what is still open.
    for (Stream* s : open) {
        File::close(s);
    }
}

}  // namespace Zel

Zel_Compress::Zel_Compress() : format_(3), level_(6), deflate_(1), encrypt_(0) {
    note("new");
    std::lock_guard<std::mutex> lock(logMutex);
    ++compressorsCreated;
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

unsigned char Zel_Compress::IsVelmorZipFormat(Zel::FileDesc file, unsigned char deep) {
    notef("IsVelmorZipFormat(%u)", static_cast<unsigned>(deep));
    const Zel::Stream::Impl* s = Zel::Registry::get().find(file.fid());
    if (s == nullptr) {
        return 0;
    }
    if (s->output || !deep) {
        return 1;
    }
    const bool digits = std::strlen(s->version) == 2 && s->version[0] >= '0' && s->version[0] <= '9' &&
                        s->version[1] >= '0' && s->version[1] <= '9';
    return digits && s->fileSize == static_cast<long long>(kHeaderBytes) + s->headerCompressed ? 1 : 0;
}

unsigned int Zel_Compress::GetNumCompressedBytes(Zel::FileDesc file) {
    note("GetNumCompressedBytes(fd)");
    const Zel::Stream::Impl* s = Zel::Registry::get().find(file.fid());
    if (s == nullptr) {
        return 0;
    }
    return s->output ? static_cast<unsigned int>(std::min<uint64_t>(s->written + s->outLen, 0xFFFFFFFFu))
                     : s->headerCompressed;
}

unsigned int Zel_Compress::GetNumUnCompressedBytes(Zel::FileDesc file) {
    note("GetNumUnCompressedBytes(fd)");
    const Zel::Stream::Impl* s = Zel::Registry::get().find(file.fid());
    if (s == nullptr) {
        return 0;
    }
    return s->output ? static_cast<unsigned int>(s->consumed) : s->headerUncompressed;
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

char* velform(const char* format, ...) {
    note("velform");
    static std::vector<char>* storage = new std::vector<char>(256);  // never freed: texts outlive statics
    if (format == nullptr) {
        return nullptr;
    }
    for (;;) {
        va_list args;
        va_start(args, format);
        const int n = std::vsnprintf(storage->data(), storage->size(), format, args);
        va_end(args);
        if (n >= 0 && static_cast<size_t>(n) < storage->size()) {
            return storage->data();
        }
        const size_t want = n >= 0 ? static_cast<size_t>(n) + 1 : storage->size() * 2;
        try {
            storage->resize(want);
        } catch (const std::bad_alloc&) {
            return nullptr;
        }
    }
}

extern "C" {

void ZelTest_BeginLog(void) {
    std::lock_guard<std::mutex> lock(logMutex);
    logging = true;
    logText.clear();
}

const char* ZelTest_Log(void) {
    std::lock_guard<std::mutex> lock(logMutex);
    logCopy = logText;
    return logCopy.c_str();
}

void ZelTest_EndLog(void) {
    std::lock_guard<std::mutex> lock(logMutex);
    logging = false;
    logText.clear();
}

int ZelTest_LiveStreams(void) {
    return Zel::Registry::get().live();
}

int ZelTest_LiveFileInits(void) {
    Zel::Registry& r = Zel::Registry::get();
    std::lock_guard<std::mutex> lock(r.mutex);
    return r.liveInits;
}

int ZelTest_CompressorsCreated(void) {
    std::lock_guard<std::mutex> lock(logMutex);
    return compressorsCreated;
}

void ZelTest_FailWrites(int errorNumber) {
    failWritesWith = errorNumber;
}

void ZelTest_FailReads(int errorNumber) {
    failReadsWith = errorNumber;
}

}  // extern "C"
