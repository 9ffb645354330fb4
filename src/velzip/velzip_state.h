// The Velzip file state, shared by all VelzipFile natives:
// plain process-wide values, no locks (Java calls the family from one thread at a time).
#pragma once

#include <jni.h>

#include "zelbrin.h"

namespace velzip {

extern int fid;                    // file id of the open file; negative: none
extern Zel::Stream* inputStream;   // the stream opened for reading, or null
extern Zel::Stream* outputStream;  // the stream opened for writing, or null
extern const char* errorMsg;       // the last failure's message; null while errorId is 0
extern int errorId;                // the last failure's number; 0: none
extern Zel_Compress* compressor;   // made on first use by ensureCompressor, never freed

// Error numbers and constant messages of the family. Id 10 is never recorded.
enum ErrorId {
    kNullPath = 1,
    kEmptyPath = 2,
    kOpenForRead = 3,
    kNotReadable = 4,
    kMissing = 5,
    kOpenForWrite = 6,
    kNotWritable = 7,
    kNoOutputStream = 8,
    kNoInputStream = 9,
    kLineOverrun = 11,
    kWriteFailed = 12,
    kReadFailed = 13,
    kBadBufferSizes = 14,
};

extern const char kMsgNoOutputStream[];
extern const char kMsgNoInputStream[];
extern const char kMsgBadBufferSizes[];

// Sets errorId and errorMsg together. A null message (velform out of memory) still records
// the number.
void recordFailure(int id, const char* message);

// Creates the shared compressor with SetVersion(3, 8) and SetCompressFlags(1, 0) when it
// does not exist yet. False only when it cannot be allocated.
bool ensureCompressor();

// The length of a Java array, or -1 for null.
jint arrayLength(JNIEnv* env, jarray array);

}  // namespace velzip
