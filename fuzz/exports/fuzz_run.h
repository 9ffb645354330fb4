// What a fuzz run builds once and every case uses: the Velzip files (whole, damaged, and
// paths that are no file), a folder for the files cases write, the run's registry key, and
// the windows the status and activate calls are aimed at.
#pragma once

#include <windows.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "fuzz_case.h"
#include "fuzz_text.h"
#include "registry_kit.h"
#include "status_window.h"
#include "temp_folder.h"

namespace fuzz {

inline std::wstring wide(const std::u16string& text) {
    return std::wstring(text.begin(), text.end());
}
inline std::u16string u16(const std::wstring& text) {
    return std::u16string(text.begin(), text.end());
}

// A path as the Velzip family meets it, and what is on disk there.
struct FileImage {
    enum Kind { Missing, Folder, File };
    std::string label;  // for messages: "truncated at 7", "folder", ...
    std::u16string path;
    Kind kind = File;
    Bytes bytes;             // the whole file
    bool intact = false;     // a complete container whose data is `content`
    Bytes content;           // the data, when intact
    bool linesSafe = false;  // intact, and every line is well-formed modified UTF-8
};

// Windows for nativeSetStatus and nativeActivateWindow: one of the driver's own that records
// the status texts it is sent, the value of a destroyed one, and handles of other processes.
struct WindowTargets {
    std::unique_ptr<testkit::StatusWindow> live;
    HWND stale = nullptr;
    std::vector<HWND> foreign;  // top-level windows of other processes, and the desktop
    // A window of a second process that counts the status texts it receives (it must get none).
    HANDLE foreignProcess = nullptr;
    volatile LONG* foreignReceived = nullptr;
};

struct Run {
    explicit Run(uint64_t seed);
    ~Run();

    uint64_t seed;
    testkit::TempFolder dir;
    std::u16string scratch;  // emptied at the start of every Velzip case
    std::vector<FileImage> corpus;
    int compressorsBefore = 0;  // Zel_Compress objects made before any case (the corpus's)
    regkit::ScopedTestKey key{"fuzz"};
    WindowTargets windows;
    long envNamesSkipped = 0;
};

// The corpus: whole files of text, lines and binary data, damaged ones (random bytes,
// truncated at every header offset and in the body, impossible counts, other version texts,
// a damaged body, bytes after the body), folders and missing paths.
std::vector<FileImage> buildCorpus(Rng& rng, const std::u16string& folder);
// A Velzip container of `data`, as the stand-in's Compress makes it.
Bytes container(const Bytes& data);
// The data of an intact container; false when it is not one.
bool uncontainer(const Bytes& buffer, Bytes* data);

// The windows of WindowTargets, and their end.
void makeWindowTargets(WindowTargets* targets);
void destroyWindowTargets(WindowTargets* targets);
// The second process's main: `fuzz_exports --foreign-window <driver's process id>`.
int foreignWindowMain(unsigned long driverProcess);

}  // namespace fuzz
