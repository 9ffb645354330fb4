// What the units of libZelbrin.dll share among themselves; never seen by its callers. The
// units: container.cpp (the Velzip format: header, Zel_Compress's codec, a stream's body
// codec), streams.cpp (streams, their table, File, FileInit), files.cpp with files_windows.cpp
// or files_posix.cpp (paths and the platform's files), velform.cpp, test_hooks.cpp (the
// observation log and fault injection).
#pragma once

#include "zelbrin.h"

#include <zlib.h>

#include <cstddef>
#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

#if defined(_WIN32)
#include <windows.h>
#endif

namespace Zel {

constexpr unsigned kHeaderBytes = 16;
constexpr unsigned char kMagic[4] = {'V', 'Z', 'L', 0x1A};
constexpr size_t kChunk = 64 * 1024;
enum { ErrArgument = 12 };  // a null buffer with a non-zero count

// ---- The container header (container.cpp) ----
uint32_t le32(const unsigned char* p);
void putLe32(unsigned char* p, uint32_t v);
void makeHeader(unsigned char* h, uint32_t compressed, uint32_t uncompressed);
bool magicMatches(const unsigned char* h);

// ---- The observation log and fault injection (test_hooks.cpp) ----
void note(const char* entry) noexcept;
// A log entry with numbers in it, formatted without the heap.
void notef(const char* format, ...) noexcept;
// Counts a Zel_Compress for ZelTest_CompressorsCreated.
void countCompressor() noexcept;
extern int failWritesWith;
extern int failReadsWith;

// ---- Paths: (modified) UTF-8 to the platform's form (files.cpp) ----

// Decodes NUL-terminated modified UTF-8 (surrogates as separate 3-byte sequences, as Java
// gives them) or standard UTF-8 into UTF-16 units. False for a malformed text, an encoded
// NUL, an unpaired surrogate or an empty text.
bool decodeUtf8(const char* text, std::u16string& out);

// ---- The platform's files (files_windows.cpp, files_posix.cpp) ----
#if defined(_WIN32)

struct NativePath {
    std::wstring text;
    bool ok = false;
    explicit NativePath(const char* path) noexcept;
    const wchar_t* c_str() const { return text.c_str(); }
};

using OsFile = HANDLE;
const OsFile kNoFile = INVALID_HANDLE_VALUE;

#else

struct NativePath {
    std::string text;
    bool ok = false;
    explicit NativePath(const char* path);
    const char* c_str() const { return text.c_str(); }
};

using OsFile = int;
const OsFile kNoFile = -1;

#endif

bool osExists(const NativePath& p);
bool osIsFolder(const NativePath& p);
bool osCanRead(const NativePath& p);
bool osCanWrite(const NativePath& p);
OsFile osOpenRead(const NativePath& p);
// Readers may share the file while it is written; another writer may not.
OsFile osOpenWrite(const NativePath& p);
long long osSize(OsFile f);
// Bytes read (0 at the end), or -1.
long osRead(OsFile f, unsigned char* buffer, size_t count);
bool osWriteAll(OsFile f, const unsigned char* data, size_t count);
bool osRewind(OsFile f);
bool osClose(OsFile f);
// Reads exactly `count` bytes unless the file ends; the count read, or -1 (files.cpp).
long osReadFull(OsFile f, unsigned char* buffer, size_t count);

// ---- A stream's state; its body codec is in container.cpp ----
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

    ~Impl();
    bool flushOut();
    // An input stream's start from the header read at open and the file's size: false when
    // the header is not a Velzip header or zlib cannot start.
    bool startInput(const unsigned char* header, long long size);
    // Decodes the next piece of the body into outBuf (used as the decoded buffer on input).
    // Returns 0, or the failure met; bytes decoded before a failure stay deliverable.
    int refill();
    bool finish();
};

// ---- The table of open streams by file id, and the live FileInit objects (streams.cpp) ----
struct Registry {
    std::mutex mutex;
    std::vector<Stream*> byFid;
    int liveInits = 0;

    int add(Stream* s);
    bool remove(Stream* s);
    Stream::Impl* find(int fid);
    int live();
    bool ready();
    static Registry& get();
    static void destroy(Stream* s) { delete s; }
};

}  // namespace Zel
