// velform: printf-style text in storage the library owns.
#include "internal.h"

#include <cstdarg>
#include <cstdio>
#include <new>

using namespace Zel;

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
