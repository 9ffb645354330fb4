#include "screenshot.h"

#include <windows.h>

#include <cstdio>
#include <string>

namespace testkit {

void saveScreenshot(const char* name) {
    char display[64] = {}, build[MAX_PATH] = {};
    if (!GetEnvironmentVariableA("DISPLAY", display, sizeof display) ||
        !GetEnvironmentVariableA("TESSEL_BUILD", build, sizeof build)) {
        return;
    }
    const std::string folder = std::string(build) + "/screenshots";
    const std::string file = folder + "/" + name + ".png";
    // Z: is Wine's drive for the Unix root.
    CreateDirectoryA(("Z:" + folder).c_str(), nullptr);
    DeleteFileA(("Z:" + file).c_str());
    std::string command = "import -window root -display " + std::string(display) + " " + file;
    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION process{};
    if (!CreateProcessA("Z:\\usr\\bin\\import", &command[0], nullptr, nullptr, FALSE, 0, nullptr, nullptr,
                        &startup, &process)) {
        std::printf("screenshot %s not taken\n", name);
        return;
    }
    // A Unix process comes without handles to wait on, so the file itself is awaited.
    if (process.hProcess != nullptr) {
        CloseHandle(process.hThread);
        CloseHandle(process.hProcess);
    }
    for (int waited = 0; waited < 5000; waited += 50) {
        if (GetFileAttributesA(("Z:" + file).c_str()) != INVALID_FILE_ATTRIBUTES) {
            Sleep(200);  // let it finish writing
            return;
        }
        Sleep(50);
    }
    std::printf("screenshot %s not written\n", name);
}

}  // namespace testkit
