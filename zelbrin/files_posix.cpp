// Files through POSIX calls, for the native Linux build that the real JVM loads.
#include "internal.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace Zel {

NativePath::NativePath(const char* path) {
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

}  // namespace Zel
