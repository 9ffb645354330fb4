// A copy of some bytes whose last byte sits right before an inaccessible page, so that code
// reading even one byte past the end faults at once instead of reading garbage unnoticed.
#pragma once

#include <windows.h>

#include <cstring>
#include <vector>

namespace testkit {

class GuardedBuffer {
public:
    explicit GuardedBuffer(const std::vector<unsigned char>& bytes) {
        SYSTEM_INFO info;
        GetSystemInfo(&info);
        const size_t page = info.dwPageSize;
        const size_t dataPages = (bytes.size() + page - 1) / page + 1;
        base_ = static_cast<unsigned char*>(
            VirtualAlloc(nullptr, (dataPages + 1) * page, MEM_RESERVE | MEM_COMMIT, PAGE_READWRITE));
        DWORD old;
        VirtualProtect(base_ + dataPages * page, page, PAGE_NOACCESS, &old);
        data_ = base_ + dataPages * page - bytes.size();
        if (!bytes.empty()) {
            std::memcpy(data_, bytes.data(), bytes.size());
        }
    }
    ~GuardedBuffer() { VirtualFree(base_, 0, MEM_RELEASE); }
    GuardedBuffer(const GuardedBuffer&) = delete;
    GuardedBuffer& operator=(const GuardedBuffer&) = delete;
    unsigned char* data() const { return data_; }

private:
    unsigned char* base_ = nullptr;
    unsigned char* data_ = nullptr;
};

}  // namespace testkit
