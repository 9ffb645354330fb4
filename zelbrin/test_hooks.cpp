// The observation log of interface calls and the fault injection that tests use.
#include "internal.h"

#include <cstdarg>
#include <cstdio>
#include <new>

namespace {

std::mutex logMutex;
bool logging = false;
std::string logText;
std::string logCopy;
int compressorsCreated = 0;

}  // namespace

namespace Zel {

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

void notef(const char* format, ...) noexcept {
    char entry[96];
    va_list args;
    va_start(args, format);
    std::vsnprintf(entry, sizeof entry, format, args);
    va_end(args);
    note(entry);
}

void countCompressor() noexcept {
    std::lock_guard<std::mutex> lock(logMutex);
    ++compressorsCreated;
}

}  // namespace Zel

using namespace Zel;

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
