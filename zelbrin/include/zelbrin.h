// libZelbrin.dll: a stand-in for the in-house library that owns files, streams, the Velzip
// container and its compression. It offers exactly the interface that libTessel_JNI.dll
// calls, built small but real: files are written and read through zlib.
//
// The Velzip container
// --------------------
// A file, and the output of Zel_Compress::Compress, is a fixed 16-byte header followed by
// one zlib stream (RFC 1950: deflate with an Adler-32 check) of the data:
//
//   offset  size  field
//        0     4  magic "VZL", 0x1A
//        4     4  version text, NUL-padded: "00" for an unencrypted file. The text is what
//                 get_zf_version gives; this stand-in writes only "00" and cannot decrypt,
//                 so a body under any other version text reads as ErrEncrypted.
//        8     4  compressed byte count: length of the zlib stream (unsigned, little-endian)
//       12     4  uncompressed byte count (unsigned, little-endian)
//
// GetNumHeaderBytes gives 16. An output stream writes the header with both counts 0,
// compresses as data is written and completes the counts when it is closed; a file whose
// writer was never closed therefore reads with an error (its counts do not match the body).
//
// Streams
// -------
// File::open(path, Read, lines) opens an existing Velzip file: it fails (null) when the file
// cannot be opened or is not a Velzip file (shorter than a header, wrong magic). The body is
// checked as it is read: a corrupt or truncated body, a body whose counts differ from the
// header, or bytes after the body give an error number from geterror, never a crash.
// File::open(path, Write, ...) creates or truncates the file, shared for reading only while
// it is open (a second writer is refused).
//
// `read` and line ends: on a stream opened with `lines` true (as libTessel_JNI.dll always
// opens), one read stops right after a line feed, which it includes; otherwise it fills the
// request. So a file written as lines ending in "\n" reads back one line per read call, and a
// block read of data with line feeds can deliver fewer bytes than asked: read again until 0.
// A read gives the count placed (0 at the end of the data) and -1 on an error; the first
// error is kept, so every later read gives -1 and geterror the same number. A read that meets
// an error after placing bytes returns those bytes, and the next read reports the error.
// `write` records an error the same way; after one, the stream stays failed.
//
// Paths are NUL-terminated (modified) UTF-8: Java's text from GetStringUTFChars, standard
// UTF-8 also accepted. On Windows they are decoded to UTF-16 and opened with the wide-character
// API, so names outside the ANSI code page work. A path that does not decode is not found.
//
// Everything needs a live FileInit: while none exists, exist/canread/canwrite give false and
// open gives null. Destroying the last FileInit closes the streams still open (an output
// stream is completed, so its data is not lost).
//
// Compressor settings: SetVersion(format, level): format must be 3 (the container above),
// level is the zlib level 0..9 (the bridge asks for 8). SetCompressFlags(deflate, encrypt):
// deflate 0 stores the data uncompressed (zlib level 0); encrypt 1 is not supported by this
// stand-in, so Compress then gives 0. Before any setting: format 3, level 6, flags 1, 0.
#pragma once

#include <cstdint>

#if defined(_WIN32)
#if defined(ZELBRIN_BUILD)
#define ZELBRIN_API __declspec(dllexport)
#else
#define ZELBRIN_API __declspec(dllimport)
#endif
#else
#define ZELBRIN_API __attribute__((visibility("default")))
#endif

namespace Zel {

// Error numbers of Stream::geterror.
enum Error {
    ErrNone = 0,
    ErrRead = 1,            // the operating system failed a read
    ErrWrite = 2,           // the operating system failed a write
    ErrNotVelzip = 3,       // not a Velzip header
    ErrCorrupt = 4,         // the zlib stream is damaged, or bytes follow it
    ErrTruncated = 5,       // the file ends before the body does
    ErrSizeMismatch = 6,    // the body does not match the header's counts
    ErrEncrypted = 7,       // version text other than "00": this stand-in cannot decrypt
    ErrWrongDirection = 8,  // read on an output stream or write on an input stream
    ErrTooLarge = 9,        // more than 4 GiB - 1 bytes on either side
    ErrNoMemory = 10,
    ErrClosed = 11  // the library was torn down under the stream (FileInit gone)
};

class File;
class FileDesc;

class ZELBRIN_API Stream {
public:
    enum Access { Read = 1, Write = 170 };

    int getfid();
    // Places up to `count` bytes; see "read and line ends" above.
    int read(unsigned char* buffer, unsigned int count);
    void write(const unsigned char* data, unsigned int count);
    // 0 after a successful read or write, else the stream's error number.
    int geterror();
    // The header's version text ("00" for an unencrypted file); "00" for an output stream.
    const char* get_zf_version();

    struct Impl;

private:
    explicit Stream(Impl* impl);
    ~Stream();
    Stream(const Stream&) = delete;
    Stream& operator=(const Stream&) = delete;

    Impl* impl_;
    friend class File;
    friend struct Registry;
};

class ZELBRIN_API File {
public:
    // exist: the path names a file or folder. canread: a file that can be opened for reading
    // now. canwrite: an existing file that can be opened for writing, or a new file that can
    // be created in an existing folder (probed by creating and deleting it); false for a
    // folder, or when the path's folder does not exist.
    static bool exist(const char* path);
    static bool canread(const char* path);
    static bool canwrite(const char* path);
    // `lines`: an input stream's reads stop after a line feed (no effect on output streams).
    static Stream* open(const char* path, Stream::Access access, bool lines);
    // Completes (output) and closes the stream and frees it; false for null or on a failure.
    static bool close(Stream* stream);
};

// Names an open stream by its file id (0 or more); passed by value.
class ZELBRIN_API FileDesc {
public:
    explicit FileDesc(int fid);
    int fid() const { return fid_; }

private:
    int fid_;
};

// The library's set-up object: one must be alive for any other call to work.
class ZELBRIN_API FileInit {
public:
    FileInit();
    ~FileInit();
    FileInit(const FileInit&) = delete;
    FileInit& operator=(const FileInit&) = delete;
};

}  // namespace Zel

class ZELBRIN_API Zel_Compress {
public:
    Zel_Compress();
    void SetVersion(unsigned int format, unsigned int level);
    void SetCompressFlags(unsigned char deflate, unsigned char encrypt);

    // Header and zlib body into dst; the byte count, or 0 when dst is too small, the
    // settings are unsupported or an argument is null. Never writes past dstSize.
    unsigned int Compress(unsigned char* dst, unsigned int dstSize, const unsigned char* src,
                          unsigned int srcSize);
    // The data of a Compress output; the byte count, or 0 when src is not a complete, intact
    // Velzip buffer of an unencrypted body or dst cannot hold the data. Reads no more than
    // srcSize bytes of src and writes no more than dstSize bytes of dst.
    unsigned int UnCompress(unsigned char* dst, unsigned int dstSize, const unsigned char* src,
                            unsigned int srcSize);

    // 1 when the open stream is a Velzip file: an output stream always; an input stream
    // passed the header check at open, and with `deep` 1 also has the version text of two
    // digits and a file length of exactly header plus compressed count. 0 for no such stream.
    static unsigned char IsVelmorZipFormat(Zel::FileDesc file, unsigned char deep);
    // The header's counts of an open input stream; for an output stream the counts so far.
    // 0 for no such stream.
    static unsigned int GetNumCompressedBytes(Zel::FileDesc file);
    static unsigned int GetNumUnCompressedBytes(Zel::FileDesc file);
    // The counts of a header held in memory (at least GetNumHeaderBytes bytes); 0 when the
    // magic does not match or header is null.
    static unsigned int GetNumCompressedBytes(const unsigned char* header);
    static unsigned int GetNumUnCompressedBytes(const unsigned char* header);
    static unsigned int GetNumHeaderBytes();
    // A buffer size for compressing `size` bytes: the size itself, or with `worstCase` 1
    // zlib's bound for a body (compressBound); plus the header when `withHeader` is 1; rounded
    // up to a multiple of 16 when `align16` is 1. Saturates at 0xFFFFFFFF.
    static unsigned int GetSizeofCompressedBuffer(unsigned int size, unsigned char withHeader,
                                                  unsigned char worstCase, unsigned char align16);
    // A buffer size for the data of a header: its uncompressed count; 0 when `validate` is 1
    // and the magic does not match; plus one byte for a terminating zero when `terminator` is
    // 1; rounded up to a multiple of 16 when `align16` is 1. Saturates at 0xFFFFFFFF.
    static unsigned int GetSizeofUnCompressedBuffer(const unsigned char* header, unsigned char validate,
                                                    unsigned char terminator, unsigned char align16);

private:
    unsigned int format_;
    unsigned int level_;
    unsigned char deflate_;
    unsigned char encrypt_;
};

// printf-style formatting (%s, %d and the rest of printf) into storage the library owns. The
// text stays valid until the next velform call replaces it; callers never free it. Any
// length fits: the storage grows as needed (null only when memory runs out).
ZELBRIN_API char* velform(const char* format, ...);

// ---- Observation and fault injection for tests (not used by libTessel_JNI.dll) ----
extern "C" {
// A log of the interface calls since ZelTest_BeginLog, as space-separated entries such as
// "exist canread open(1,1) getfid" or "new SetVersion(3,8) SetCompressFlags(1,0) Compress".
ZELBRIN_API void ZelTest_BeginLog(void);
ZELBRIN_API const char* ZelTest_Log(void);  // valid until the next interface call
ZELBRIN_API void ZelTest_EndLog(void);
ZELBRIN_API int ZelTest_LiveStreams(void);
ZELBRIN_API int ZelTest_LiveFileInits(void);
ZELBRIN_API int ZelTest_CompressorsCreated(void);
// From now on, every write on an output stream fails with this error number (0: stop).
ZELBRIN_API void ZelTest_FailWrites(int errorNumber);
// From now on, every read on an input stream records this error number (0: stop) after
// delivering what it read: the count stands, and geterror then reports the number.
ZELBRIN_API void ZelTest_FailReads(int errorNumber);
}
