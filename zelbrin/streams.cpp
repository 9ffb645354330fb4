// Streams and their table of file ids, File's queries and opening, FileInit, and the
// Zel_Compress queries about an open stream.
#include "internal.h"

#include <algorithm>
#include <cstring>
#include <new>

namespace Zel {

int Registry::add(Stream* s) {
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

bool Registry::remove(Stream* s) {
    std::lock_guard<std::mutex> lock(mutex);
    const int fid = s->impl_->fid;
    if (fid < 0 || static_cast<size_t>(fid) >= byFid.size() || byFid[fid] != s) {
        return false;
    }
    byFid[fid] = nullptr;
    return true;
}

Stream::Impl* Registry::find(int fid) {
    std::lock_guard<std::mutex> lock(mutex);
    if (fid < 0 || static_cast<size_t>(fid) >= byFid.size() || byFid[fid] == nullptr) {
        return nullptr;
    }
    return byFid[fid]->impl_;
}

int Registry::live() {
    std::lock_guard<std::mutex> lock(mutex);
    return static_cast<int>(
        std::count_if(byFid.begin(), byFid.end(), [](Stream* s) { return s != nullptr; }));
}

bool Registry::ready() {
    std::lock_guard<std::mutex> lock(mutex);
    return liveInits > 0;
}

Registry& Registry::get() {
    static Registry* registry = new Registry;  // never destroyed: streams may outlive statics
    return *registry;
}

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
            !impl->startInput(header, osSize(impl->file))) {
            delete impl;
            return nullptr;
        }
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

using namespace Zel;

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
